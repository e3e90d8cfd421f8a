"""Broken statements: each gives results or one error in its place, and the statement behind it is served as ever.

Statements of the library (and of a list, for forms that it lacks) are broken at random: tokens dropped, doubled,
exchanged, replaced and cut short; bytes changed. Seeded; QUILLET_FULL=1 makes ten times as many.
"""

from __future__ import annotations

import os
import random
import re
import sysconfig
from collections.abc import Iterator
from pathlib import Path

import pytest

from quillet import Line, SourceEncodingError, analyze
from survey import NO_STATEMENT, NOT_THE_LIBRARY, reports_to

FULL = os.environ.get("QUILLET_FULL") == "1"
MUTATED = 200_000 if FULL else 20_000
EACH_NTH_FILE = 4 if FULL else 40

HEADS = ("match", "case", "with", "async", "except", "def", "class", "type", "@")

FORMS = """
match x:
match a, *b:
match (yield x), lambda: 0:
case _:
case -1 - 2j:
case a.b.C(0, x=[y, *z], w={"k": v, **r}) | None:
case [a, (b, c), *_] if (d := a) > 1: pass
case {"k": [x, y], -1: "s", **rest} as whole: x = 1
case ((a | b), Foo((c))): return x
with (open(a) as f, open(b) as g,):
with a as (b, c), d as e[0]: pass
async with a as b, c:
with (a, b) as c, d:
except* (E, F) as e:
except E as e: pass
except *E:
def f[T: (int, str), *Ts, **P](x: T, /, y: list[T] = [], *args, k=1, **kw) -> dict[str, T]: return x
async def f[T](x): await x
class C[T: int, *Ts](Base[T], metaclass=M): x: int = 1
type X[T, *Ts, **P] = dict[T, Callable[P, T]]
type X = int
def f(a, b):  # type: (int, List[str]) -> bool
@a.b.c(1, *x, y=lambda z: z)
for x in a, *b:  # type: int
x: List['T'] = f"{a!r:>{w}} {b['k']}"
""".strip().split("\n")

#: Forms of 2.7 only.
PYTHON_2_FORMS = """
print >>f, "a", `b`
print x, y,
except E, e:
exec code in a, b
raise E, "text", tb
def f(a, (b, (c, d)), e=1): pass
x = 0777L <> ur"s"
""".strip().split("\n")

PIECES = ["\n", " ", "\t", "# type: int", "# type: (int", "# c\n", "\\\n", "\\ "]
PIECES += """
( ) [ ] { } , : . = ; * ** | -> := @ - + ... ! ~ ` <> != == -= >>= \\ # \n \r\n \f \0 é ٣ € \ufeff 'x' "x ''' f'{x}' f'{
rb'' 0 1e 0x 1_ .5 2j x _ é match case type with as async await except def class if else elif lambda for in not is yield
from import print exec None True del try finally return pass global nonlocal while and or type: #type:
""".split()

LETTERS = "\0\t\n\r\"'\\\x7f\xe9\u20ac\U0001f40d"

TOKEN = re.compile(r"\w+|\s+|'[^'\n]*'|\"[^\"\n]*\"|\W")

#: What is reported, and nothing else: an expression is needed where a "..." or a type comment's statement stands.
NO_EXPRESSION = re.compile(
    r"(?:TypeError\('Expected CExpression, got CNode'\)|needs to be a CExpression; .*)\n  logical tokens: .*\.\.\."
    r"|TypeError\('Expected CExpression, got C\w+'\)\n  logical tokens: .*#.*type:",
    re.DOTALL,
)

NEXT = "served = as_before(1, 'two')"


def version_for(draw: random.Random) -> tuple[int, int]:
    return draw.choice(((3, 13), (3, 13), (3, 12), (3, 8), (3, 6), (2, 7)))


def library_statements() -> Iterator[str]:
    root = Path(sysconfig.get_path("stdlib"))
    paths = sorted(path for path in root.rglob("*.py") if not NOT_THE_LIBRARY & set(path.parts))
    for path in paths[::EACH_NTH_FILE]:
        try:
            analysis = analyze(path.read_bytes())
        except SourceEncodingError:
            continue
        physical = analysis.source.decode("utf-8", "replace").splitlines()
        for line in analysis.lines:
            if line.logical.fType not in NO_STATEMENT:
                yield "\n".join(physical[line.first_line - 1 : line.last_line])[:2000]


@pytest.fixture(scope="module")
def statements() -> list[str]:
    """Half of them begin with one of HEADS, where the library has as many."""
    found = list(library_statements())
    heads = [text for text in found if text.lstrip().startswith(HEADS)]
    return (FORMS + PYTHON_2_FORMS) * (1 + len(heads) // 100) + heads * (len(found) // (2 * len(heads)) + 1) + found


def mutated(draw: random.Random, text: str) -> str:
    pieces = TOKEN.findall(text)
    for _ in range(draw.choice((1, 1, 1, 2, 3, 8))):
        if not pieces:
            return ""
        i = draw.randrange(len(pieces))
        j = min(len(pieces), i + draw.choice((1, 1, 1, 2, 5)))
        match draw.randrange(8):
            case 0:
                del pieces[i:j]
            case 1:
                pieces[i:i] = pieces[i:j] * draw.choice((1, 1, 2, 20))
            case 2:
                pieces[i] = draw.choice(PIECES)
            case 3:
                pieces.insert(i, draw.choice(PIECES))
            case 4:
                k = draw.randrange(len(pieces))
                pieces[i], pieces[k] = pieces[k], pieces[i]
            case 5:
                pieces[draw.choice((i, j)) :] = []
            case 6:
                pieces[i:j] = draw.choices(pieces, k=j - i)
            case _:
                letters = list(pieces[i])
                letters[draw.randrange(len(letters))] = draw.choice(LETTERS)
                pieces[i] = "".join(letters)
    return "".join(pieces)


def extent(line: Line, source: bytes) -> tuple[tuple[int, int], tuple[int, int]]:
    """The first place of a line's first token and the place just past the last one: (line, column) from 1."""
    toks, positions = line.logical.fToks, line.logical.fPositions
    text = (toks[-1] or "").encode("utf-8", "surrogateescape")
    ends = re.split(rb"\r\n|\r|\n", text)
    first, last = positions[0], positions[-1]
    last_column = (last[1] if len(ends) == 1 else 0) + len(ends[-1])
    return (line.first_line + first[0], first[1] + 1), (line.first_line + last[0] + len(ends) - 1, last_column + 1)


def decoded(line: Line) -> list[tuple[str, str, str]]:
    return [(record.name, record.kind.value, record.detail) for record in line.records]


@pytest.mark.parametrize("exact", [True, False], ids=["exact", "complete"])
def test_broken_statements_give_errors_in_their_place_and_nothing_else(
    statements: list[str], capsys: pytest.CaptureFixture[str], exact: bool
) -> None:
    draw = random.Random(7)
    reports: list[str] = []
    (alone,) = analyze(NEXT).lines
    served = decoded(alone)
    assert served
    accepted = rejected = 0
    for _ in range(MUTATED):
        # What the broken statement leaves open (a bracket, a string, a backslash) may take the def line with it.
        text = mutated(draw, draw.choice(statements))
        source = f"{text}\ndef behind(): pass\n{NEXT}\n"
        with reports_to(reports):
            analysis = analyze(source, version=version_for(draw), exact=exact)
        for line in analysis.lines:
            if line.error is None:
                accepted += 1
                decoded(line)
                continue
            rejected += 1
            assert isinstance(line.error, SyntaxError)
            # What concerns a hint or a place alone leaves the records of a complete reading.
            assert not exact or line.records == (), text
            decoded(line)
            first, last = extent(line, analysis.source)
            assert line.error_position is not None
            # What is missing at the end is missing where the line ends, which is behind its blanks.
            rest = analysis.source_line(last[0])[last[1] - 1 :]
            last = (last[0], last[1] + len(rest) - len(rest.lstrip(b" \t")))
            if not exact:
                # Of the indentation, or of what is in front of it on its line.
                first, last = (first[0], 1), max(last, (first[0], len(analysis.source_line(first[0])) + 1))
            assert first <= line.error_position <= last, text
        behind = analysis.lines[-1]
        assert behind.logical.fToks == alone.logical.fToks, text
        assert behind.error is None, text
        assert decoded(behind) == served, text
    with capsys.disabled():
        print(f"\n{MUTATED:,} broken statements: {accepted:,} lines served, {rejected:,} with an error")
    assert [report for report in reports if not NO_EXPRESSION.search(report)] == []
    assert rejected > MUTATED / 4
    assert accepted > MUTATED
