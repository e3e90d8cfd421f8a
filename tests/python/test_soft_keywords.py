"""`match` and `case` as statements and as names, against the host's own parser.

Every line of the standard library that begins with one of the words is compared; so are statements made at
random from everything that may stand behind the words. Two tables hold what people write and what is hard.
"""

from __future__ import annotations

import ast
import os
import random
import re
import sysconfig
import warnings
from collections.abc import Iterator
from pathlib import Path

import pytest

from quillet import Analysis, Line, analyze
from quillet.logicalline import CLogicalLine, FindMatchOrCaseType, GetLogicalsFromText, kCase, kMatch, kUnknown
from survey import NOT_THE_LIBRARY

FULL = os.environ.get("QUILLET_FULL") == "1"
MADE = 200_000 if FULL else 15_000
WORDS = ("match", "case")
BEGINS_WITH_WORD = re.compile(rb"^[ \t\f]*(?:match|case)\b", re.MULTILINE)


def kind_of_line(logical: CLogicalLine) -> str:
    """What a line was taken for when it was cut, which the tokens alone must agree with."""
    kind = logical.fType if logical.fType in (kMatch, kCase) else kUnknown
    by_tokens = FindMatchOrCaseType(logical.fToks, 0, len(logical.fToks))
    # Texts do not tell whether a bracket touches the name in front of it.
    assert by_tokens == kind or (by_tokens == kCase and logical.fToks[:2] == ("case", "[")), logical.fToks
    return kind


def kind_of(text: str) -> str:
    return kind_of_line(GetLogicalsFromText(text, (3, 13))[0])


# ---- the library ----


def files_with_the_words() -> Iterator[tuple[Path, bytes]]:
    root = Path(sysconfig.get_path("stdlib"))
    for path in sorted(root.rglob("*.py")):
        if not NOT_THE_LIBRARY & set(path.parts):
            source = path.read_bytes()
            if BEGINS_WITH_WORD.search(source):
                yield path, source


def first_token(line: Line) -> tuple[int, int]:
    """Where a line's first token stands, as ast counts: the line from 1, the column in bytes from 0."""
    row, column = line.logical.fPositions[0]
    return line.logical.fFirstLine + row + 1, column


class HostStatements(ast.NodeVisitor):
    """Where the match statements begin, and where the patterns of their cases do."""

    def __init__(self) -> None:
        self.matches: set[tuple[int, int]] = set()
        self.patterns: list[tuple[int, int]] = []

    def visit_Match(self, node: ast.Match) -> None:
        self.matches.add((node.lineno, node.col_offset))
        self.patterns += [(case.pattern.lineno, case.pattern.col_offset) for case in node.cases]
        self.generic_visit(node)


def heads_of(patterns: list[tuple[int, int]], lines: list[tuple[int, int]]) -> set[tuple[int, int]]:
    """The lines in which patterns stand: the last line that begins in front of each."""
    return {max(begin for begin in lines if begin <= pattern) for pattern in patterns}


def test_lines_of_the_library_are_what_the_host_takes_them_for(capsys: pytest.CaptureFixture[str]) -> None:
    counts = dict.fromkeys((kMatch, kCase, kUnknown), 0)
    for path, source in files_with_the_words():
        analysis: Analysis = analyze(source, exact=True)
        host = HostStatements()
        try:
            with warnings.catch_warnings():
                warnings.simplefilter("ignore")
                host.visit(ast.parse(analysis.source.decode("utf-8").removeprefix("\ufeff")))
        except (SyntaxError, ValueError):
            continue
        lines = [line for line in analysis.lines if line.logical.fToks]
        with_word = {first_token(line): line for line in lines if line.logical.fToks[0] in WORDS}
        found = {kind: {at for at, line in with_word.items() if kind_of_line(line.logical) == kind} for kind in counts}
        assert found[kMatch] == host.matches, path
        assert found[kCase] == heads_of(host.patterns, [first_token(line) for line in lines]), path
        assert len(found[kCase]) == len(host.patterns), path
        assert not any(line.logical.fType in (kMatch, kCase) for line in lines if line.logical.fToks[0] not in WORDS)
        for kind, places in found.items():
            counts[kind] += len(places)
    with capsys.disabled():
        numbers = f"{counts[kMatch]} match, {counts[kCase]} case, {counts[kUnknown]} ordinary statements"
        print(f"\nlines that begin with the words: {numbers}")
    assert min(counts.values()) > 0


# ---- what the host says of a single statement ----


def parses(text: str) -> ast.Module | None:
    with warnings.catch_warnings():
        warnings.simplefilter("ignore")
        try:
            return ast.parse(text)
        except (SyntaxError, ValueError, MemoryError, RecursionError):
            return None


def kinds_by_host(text: str) -> set[str]:
    """All that the host may take a one-line statement for, by what stands around it."""
    kinds = set()
    tree = parses(text)
    if tree is not None and len(tree.body) == 1:
        kinds.add(kUnknown)
    tree = parses(f"{text}\n  case _: pass\n")
    if tree is not None and isinstance(tree.body[0], ast.Match):
        kinds.add(kMatch)
    for body in ("", " pass"):
        tree = parses(f"match _:\n  {text}{body}\n")
        if tree is not None and isinstance(tree.body[0], ast.Match):
            kinds.add(kCase)
    return kinds


ORDINARY = [
    "{}",
    "{} = 1",
    "{} = {}(x)",
    "{} == x",
    "{}: int",
    "{}: int = 1",
    "{}: (lambda: 0) = 1",
    "{}: 'T'",
    "{}, y = z",
    "{},",
    "*{}, y = z",
    "{} += 1",
    "{} -= [x][0]",
    "{} -x",
    "{} - x",
    "{} * x",
    "{} ** -x",
    "{} @ x",
    "{} if x else y",
    "{} if {x: y} else z",
    "{} in x",
    "{} not in x",
    "{} is not x",
    "{} if x else lambda: 0",
    "{}, lambda: 0",
    "{} and x[1:]",
    "{} if x else lambda x: {{x: x}}",
    "{}()",
    "{}(x)",
    "{}(x)(y)",
    "{}(x).y",
    "{}(x)[y]",
    "{} (x)",
    "{} (x, y)",
    "{} (x, y=lambda: 0)",
    "{} ({{x: y}})",
    "{} (x).y",
    "{} (x) or y",
    "{} (x) if y else z",
    "{}(x).y: int",
    "{}(x)[0]: int = 1",
    "{} (x).y: int",
    "{}[x]",
    "{}[1:2]",
    "{}[1:2] = x",
    "{} [x] = y",
    "{} [x][y] = z",
    "{} [x], y = z",
    "{}[x]: int",
    "{}[x]: int = 3",
    "{}[x]: int = 3, 4",
    "{}[x][y]: int",
    "{} [x].y: int",
    "{}[x].y: int",
    "{}[lambda: 0]: int",
    "{}.x",
    "{}.x = 1",
    "{}.x: int",
    "{} .x: int = 1",
    "{}.{}",
    "{}.match(x).case[y]: z",
    "{} = lambda: 0",
    "{} = {{1: 2}}",
    "{} = x if y else z",
    "{} = {} = 1",
    "{} = yield",
    "{}: [x]",
    "{}: {{x: y}}",
    "{}[x:y]: int",
    "{}[{{x: y}}]: int",
]

MATCHES = [
    "match x:",
    "match(x):",
    "match (x):",
    "match (x, y):",
    "match(x, y):",
    "match x, y:",
    "match x,:",
    "match *x, y:",
    "match -x:",
    "match - x:",
    "match ~x:",
    "match not x:",
    "match [x]:",
    "match[x]:",
    "match [x][0]:",
    "match [x, y]:",
    "match []:",
    "match {}:",
    "match {x: y}:",
    "match {**x}:",
    "match ...:",
    "match 'x':",
    "match 1:",
    "match None:",
    "match (yield):",
    "match await x:",
    "match x[1:2]:",
    "match x[lambda: 0]:",
    "match lambda: 0:",
    "match lambda x: lambda: 0:",
    "match lambda x={1: 2}: x:",
    "match x if y else z:",
    "match x if y else lambda: z:",
    "match x, lambda: y:",
    "match match:",
    "match case:",
    "match match, case:",
    "match (match):",
    "match x.match:",
    "match x == y:",
    "match x in y:",
    "match x:  # with a comment: and a colon",
    "match (x := y):",
    "match x := y:",
    "match (x for x in y):",
    "match f(x, y=lambda: 0):",
    "match print(x):",
    "match ():",
    "match (x)(y):",
    "match (x).y:",
    "match[x].y:",
    "match not x in y:",
]

CASES = [
    "case x:",
    "case _:",
    "case(x):",
    "case (x):",
    "case (x, y):",
    "case x, y:",
    "case *x, y:",
    "case x,:",
    "case [x]:",
    "case[x]:",
    "case [x, *_]:",
    "case []:",
    "case ():",
    "case {}:",
    "case {'k': v}:",
    "case {'k': v, **rest}:",
    "case -1:",
    "case -1 - 2j:",
    "case 's':",
    "case 's' 't':",
    "case a.b:",
    "case a.b.c():",
    "case A(x=1):",
    "case A(x=[y, *z]):",
    "case A() as b:",
    "case x | y:",
    "case (x | y) as z:",
    "case None:",
    "case match:",
    "case case:",
    "case case():",
    "case {case.x: case}:",
    "case x if y:",
    "case x if lambda: y:",
    "case x if lambda y: lambda: y: pass",
    "case x if {y: z}:",
    "case x if y[1:2]:",
    "case x if (y if z else w):",
    "case x if y if z else w:",
    "case x: pass",
    "case x: y = 1",
    "case x: y: int = 1",
    "case x: lambda: 0",
    "case x: y = lambda: 0",
    "case x: return",
    "case x: y; z",
    "case [x]: return",
    "case [x]: y = z = 1",
    "case [x]: y += 1",
    "case [x]: pass",
    "case[x]: y: int",
    "case[x]: y: int = 1",
    "case[x]: y, z = 1",
    "case [x] if y: z",
    "case [x], y: z",
    "case []: y",
]


@pytest.mark.parametrize("word", WORDS)
@pytest.mark.parametrize("form", ORDINARY)
def test_ordinary_statements_stay_ordinary(form: str, word: str) -> None:
    text = form.replace("{}", word).replace("{{", "{").replace("}}", "}")
    assert kUnknown in kinds_by_host(text)
    assert kind_of(text) == kUnknown


@pytest.mark.parametrize(("kind", "texts"), [(kMatch, MATCHES), (kCase, CASES)], ids=WORDS)
def test_statements_are_found(kind: str, texts: list[str]) -> None:
    wrong = [text for text in texts if kind not in kinds_by_host(text)]
    assert wrong == [], "the host does not take these for what they are meant to be"
    assert [text for text in texts if kind_of(text) != kind] == []


#: Where a statement could be either, the blank in front of the bracket decides: a person who writes a subscript
#: puts none, and one who writes a pattern does.
EITHER = [("case [x]: y", kCase), ("case[x]: y", kUnknown), ("case [x]: y = 1", kCase), ("case[x]: y = 1", kUnknown)]


@pytest.mark.parametrize(("text", "kind"), EITHER)
def test_what_could_be_either_is_taken_as_it_is_written(text: str, kind: str) -> None:
    assert kinds_by_host(text) == {kCase, kUnknown}
    assert kind_of(text) == kind


@pytest.mark.parametrize(
    "text", ["match:", "case:", "match", "case", "match x", "case x", "match x: pass", "matches x:"]
)
def test_what_is_no_statement_at_all_is_no_match_and_no_case(text: str) -> None:
    assert kind_of(text) == kUnknown


# ---- statements made at random ----

ATOMS = ["x", "match", "case", "_", "1", "'s'", "None", "...", "[]", "()", "{}"]
FORMS = [
    *["{}"] * 6, "({})", "[{}]", "{{{}}}", "{{{}: {}}}", "{}.x", "{}.match", "{}[{}]", "{}[{}:{}]", "{}({})",
    "{}(x={})", "lambda: {}", "lambda x={}: {}", "{} if {} else {}", "-{}", "not {}", "*{}", "{}, {}", "{},",
    "({} := {})", "{} | {}", "{} as x", "{} in {}", "{} == {}", "{} or {}", "await {}", "(yield {})", "x({}, {})",
    "**{}", "{{'k': {}, **{}}}", "x({}).y", "[{}, *{}]", "x.y.z", "A(x={})", "[{} for x in {}]",
]  # fmt: skip
TAILS = [
    *[":"] * 8, "", ": {}", ": {} = {}", ": {} = {} = {}", ": x += {}", ": pass", ": return {}", ": x: {}", " = {}",
    " if {}:", " if {}: {}", " if {} else {}", " as x:", " as x if {}:", " += {}", ", {} = {}", ":= {}", " is {}",
]  # fmt: skip


def expression(draw: random.Random, depth: int) -> str:
    if depth == 0:
        return draw.choice(ATOMS)
    form = draw.choice(FORMS)
    parts = [expression(draw, depth - 1) for _ in range(form.count("{}"))]
    return form.replace("{}", "\0").replace("{{", "{").replace("}}", "}").replace("\0", "%s") % tuple(parts)


def statement(draw: random.Random) -> str:
    tail = draw.choice(TAILS)
    for _ in range(tail.count("{}")):
        tail = tail.replace("{}", expression(draw, draw.choice((0, 1))), 1)
    return draw.choice(WORDS) + draw.choice(("", " ", " ")) + expression(draw, draw.choice((0, 1, 1, 2))) + tail


def could_be_either(text: str) -> bool:
    """An annotated subscript that only lacks a body that is a pattern's, or a pattern, to be a case statement."""
    tree = parses(text)
    target = tree.body[0].target if tree is not None and isinstance(tree.body[0], ast.AnnAssign) else None
    return isinstance(target, ast.Subscript) and isinstance(target.value, ast.Name) and text.startswith("case [")


def test_made_statements_are_what_the_host_takes_them_for(capsys: pytest.CaptureFixture[str]) -> None:
    draw = random.Random(20)
    counts = dict.fromkeys((kMatch, kCase, kUnknown), 0)
    wrong = []
    for _ in range(MADE):
        text = statement(draw)
        if not text.startswith(tuple(f"{word}{sign}" for word in WORDS for sign in " ([{.:,-*")):
            continue
        kinds = kinds_by_host(text)
        if len(kinds) == 1 and not could_be_either(text):
            kind = kinds.pop()
            counts[kind] += 1
            if kind_of(text) != kind:
                wrong.append((text, kind))
    with capsys.disabled():
        print(f"\nmade at random: {counts[kMatch]} match, {counts[kCase]} case, {counts[kUnknown]} ordinary statements")
    assert wrong == []
    assert min(counts.values()) > MADE / 100
