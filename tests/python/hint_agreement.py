"""The hints that quillet records, beside the annotations and type comments that the host's `ast` finds.

`ast.parse(..., type_comments=True)` hands the text of a comment to the statement or parameter that it belongs
to, and its mode "func_type" reads signatures. `HintExpectation` pairs those texts with names and says by a
`HintRule` where quillet means to differ. A hint is compared as an expression, so that spelling plays no part.

The trap: the host refuses a whole file for one type comment in a place where it takes none. Such a comment is
struck out for the host and for quillet, and counted.

Run as a command it compares files and folders, and prints the table of docs/agreement.md:

    python tests/python/hint_agreement.py [--complete] [--python 2.7] FILE OR FOLDER...
"""

from __future__ import annotations

import argparse
import ast
import copy
import io
import re
import sys
import tokenize
import warnings
from collections import Counter, defaultdict
from collections.abc import Iterator
from dataclasses import dataclass, field
from enum import Enum
from pathlib import Path
from typing import NamedTuple

if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parent.parent.parent / "scripts"))

import rejections
from agreement import Events, again, facts_of, files_of, normal, text_table, watched
from expected_names import Expectation, Fact, Groups, Kind, Rule, expression_of
from quillet import Analysis, Line, RecordKind, SourceEncodingError, analyze
from quillet._source import to_utf8

_COMMENT_OF_PARAMETER = re.compile(r"\s*,?\s*(#.*)")
_HARMLESS = re.compile(r"[\w \"',.]*")
_REFUSED = re.compile(r"#[^'\"]*?type:")


class HintKind(str, Enum):
    """What a hint is of, and where it stands."""

    VARIABLE = "variable, comment"
    PARAMETER = "parameter, comment of its own"
    SIGNATURE = "parameter, signature comment"
    RETURN = "return, signature comment"
    ANNOTATION = "annotation"
    READ = "names read in comments"


class HintRule(str, Enum):
    """Why quillet means to say something else than the tree."""

    IGNORE = "`ignore` with a reason is a hint"
    BEHIND = "a hint may stand behind another comment"
    CHAINED = "of several targets of one value, the first takes the hint"
    SHAPE = "several names take hints of the same shape, or none"
    NOT_DOTTED = "a target or parameter that is no dotted name takes no hint"
    ANNOTATED = "a parameter with an annotation takes no comment"
    FROM_THE_FIRST = "a signature is paired from the first parameter on"
    CONTINUED = "a comment on a row of its own, behind a backslash, is not that of the statement"
    SURPLUS = "a surplus type of a signature is recorded by its place"
    TRAILING_COMMA = "a signature may end its types with a comma"
    BARE_ELLIPSIS = "a bare `...` as a hint leaves the statement without records"
    NO_PARAMETERS = "types for a function without parameters leave it without records"
    REJECTED = "a statement whose hint cannot be read is rejected"


class Hint(NamedTuple):
    """A name, the text of its hint, and whether it belongs to the scope that the statement opens."""

    name: str
    text: str
    is_parameter: bool


def same_text(text: str) -> str:
    """A hint's text, however it was spelt."""
    expression = expression_of(text)
    return ast.unparse(expression) if expression is not None else " ".join(text.split())


class _AsRecorded(ast.NodeTransformer):
    """An expression as the text of a hint has it: without arguments, and with harmless strings only."""

    def visit_Call(self, node: ast.Call) -> ast.expr:
        return ast.Call(self.visit(node.func), [], [])

    def visit_Constant(self, node: ast.Constant) -> ast.expr:
        if isinstance(node.value, str) and not _HARMLESS.fullmatch(node.value):
            return ast.Constant("")
        return node


def text_of(hint: ast.expr) -> str:
    """The text that is recorded for a hint. A string stands for what is in it."""
    if isinstance(hint, ast.Constant) and isinstance(hint.value, str):
        return same_text(hint.value)
    return ast.unparse(_AsRecorded().visit(copy.deepcopy(hint)))


def hint_in(comment: str) -> str | None:
    """The hint that quillet takes from a comment."""
    before, sign, hint = comment.partition("type:")
    hint = hint.partition("#")[0].strip()
    return hint if sign and before.rstrip().endswith("#") and hint not in ("", "ignore") else None


class HintExpectation(Expectation):
    """The hints of a tree, by group, and the names that are read in comments."""

    def __init__(
        self, tree: ast.AST, groups: Groups, source: list[bytes], comments: dict[int, str], exact: bool = True
    ) -> None:
        self._exact = exact
        self.hints: dict[int, dict[Hint, HintKind]] = defaultdict(dict)
        self.hints_dropped: dict[int, dict[Hint, tuple[HintKind, HintRule]]] = defaultdict(dict)
        self.hints_added: dict[int, dict[Hint, tuple[HintKind, HintRule]]] = defaultdict(dict)
        self.with_comments: set[int] = set()
        self.without_parameters: set[int] = set()
        self._comments = comments
        self._source = source
        self._in_class = False
        super().__init__(tree, groups, source)

    # ---- filing ----

    def _file(
        self, kind: HintKind, name: str, hint: ast.expr, row: int, rule: HintRule | None = None, drop: bool = False
    ) -> None:
        group = self._groups.at(row)
        is_parameter = kind in (HintKind.PARAMETER, HintKind.SIGNATURE, HintKind.RETURN)
        fact = Hint(name, text_of(hint), is_parameter)
        if rule is None:
            self.hints[group][fact] = kind
        elif drop:
            self.hints_dropped[group].setdefault(fact, (kind, rule))
        else:
            self.hints_added[group].setdefault(fact, (kind, rule))

    def _read_hint(self, hint: ast.expr, row: int) -> None:
        self.with_comments.add(self._groups.at(row))
        with self._within(_line=row, _only_ours=Rule.COMMENT_HINT):
            self._check_ellipsis(hint)
            self.visit(hint)

    def _end_row(self, node: ast.AST) -> int:
        """The last row of a statement or of a statement's head."""
        return self._groups.lines[self._group(node)][-1].last_line

    def _hint_in(self, comment: str) -> str | None:
        text = hint_in(comment)
        # A complete reading takes what begins with the word for no type, whatever follows.
        return None if text is not None and not self._exact and text.startswith("ignore") else text

    # ---- targets ----

    def _comment_at_end(self, node: ast.Assign | ast.For | ast.AsyncFor | ast.With | ast.AsyncWith) -> None:
        row = self._end_row(node)
        comment = self._comments.get(row, "")
        rule = None
        text = node.type_comment
        if text is None:
            end = node.end_col_offset if isinstance(node, ast.Assign) and node.end_lineno == row else None
            if end is not None and b";" in self._source[row - 1][end:].partition(b"#")[0]:
                return  # the comment is that of another statement
            text = self._hint_in(comment)
            rule = HintRule.IGNORE if text is not None and text.startswith("ignore") else HintRule.BEHIND
        hint = expression_of(text.partition("#")[0]) if text is not None else None
        if hint is None:
            return
        if isinstance(node, ast.Assign):
            if self._source[row - 1].lstrip().startswith(b"#"):
                self._pair(node.targets[0], hint, row, HintRule.CONTINUED, drop=True)
                return
            self._pair(node.targets[0], hint, row, rule)
            for target in node.targets[1:]:
                if rule is None:
                    self._pair(target, hint, row, HintRule.CHAINED, drop=True)
        elif isinstance(node, (ast.For, ast.AsyncFor)):
            self._pair(node.target, hint, row, rule)
        else:
            for item in node.items:
                if item.optional_vars is not None:
                    self._pair(item.optional_vars, hint, row, rule)
        self._read_hint(hint, row)

    def _pair(self, target: ast.expr, hint: ast.expr, row: int, rule: HintRule | None, drop: bool = False) -> None:
        if isinstance(target, (ast.Tuple, ast.List)):
            hints = hint.elts if isinstance(hint, (ast.Tuple, ast.List)) else []
            for inner, inner_hint in zip(target.elts, hints, strict=False):
                self._pair(inner, inner_hint, row, rule, drop)
            if len(hints) != len(target.elts) and rule is None:
                self._file(HintKind.VARIABLE, ast.unparse(target), hint, row, HintRule.SHAPE, drop=True)
            return
        chain = self._chain(target)
        if chain is not None and not self._has_inner_brackets(target):
            self._file(HintKind.VARIABLE, chain, hint, row, rule, drop)
        elif rule is None:
            self._file(HintKind.VARIABLE, ast.unparse(target), hint, row, HintRule.NOT_DOTTED, drop=True)

    def visit_Assign(self, node: ast.Assign) -> None:
        self._comment_at_end(node)
        super().visit_Assign(node)

    def visit_For(self, node: ast.For | ast.AsyncFor) -> None:
        self._comment_at_end(node)
        super().visit_For(node)

    visit_AsyncFor = visit_For

    def visit_With(self, node: ast.With | ast.AsyncWith) -> None:
        self._comment_at_end(node)
        self.generic_visit(node)

    visit_AsyncWith = visit_With

    def visit_AnnAssign(self, node: ast.AnnAssign) -> None:
        chain = self._chain(node.target)
        if chain is not None:
            self._file(HintKind.ANNOTATION, chain, node.annotation, node.lineno)
        super().visit_AnnAssign(node)

    # ---- functions ----

    def visit_ClassDef(self, node: ast.ClassDef) -> None:
        with self._within(_in_class=True):
            super().visit_ClassDef(node)

    def visit_FunctionDef(self, node: ast.FunctionDef | ast.AsyncFunctionDef) -> None:
        is_method = self._in_class and not any(self._chain(d) == "staticmethod" for d in node.decorator_list)
        parameters = _in_order(node.args)
        for parameter in parameters:
            self._own_comment(node, parameter)
        if node.returns is not None:
            self._annotate("return", node.returns, node.lineno)
        self._signature(node, [normal(parameter.arg) for parameter in parameters], is_method)
        with self._within(_in_class=False):
            super().visit_FunctionDef(node)

    visit_AsyncFunctionDef = visit_FunctionDef

    def _annotate(self, name: str, hint: ast.expr, row: int) -> None:
        self.hints[self._groups.at(row)][Hint(name, text_of(hint), True)] = HintKind.ANNOTATION

    def _own_comment(self, node: ast.FunctionDef | ast.AsyncFunctionDef, parameter: ast.arg) -> None:
        if parameter.annotation is not None:
            self._annotate(parameter.arg, parameter.annotation, node.lineno)
        rule = HintRule.ANNOTATED if parameter.annotation is not None else None
        text = parameter.type_comment
        if text is None and rule is None:
            text = self._hint_in(self._comment_behind(node, parameter))
            rule = HintRule.IGNORE if text is not None and text.startswith("ignore") else HintRule.BEHIND
        hint = expression_of(text.partition("#")[0]) if text is not None else None
        if hint is None:
            return
        self._file(HintKind.PARAMETER, parameter.arg, hint, parameter.lineno, rule, rule is HintRule.ANNOTATED)
        if rule is not HintRule.ANNOTATED:
            self._read_hint(hint, parameter.lineno)

    def _comment_behind(self, node: ast.FunctionDef | ast.AsyncFunctionDef, parameter: ast.arg) -> str:
        defaults = [default for default in (*node.args.defaults, *node.args.kw_defaults) if default is not None]
        ends = [(parameter.end_lineno or 0, parameter.end_col_offset or 0)]
        following = [p for p in _in_order(node.args) if (p.lineno, p.col_offset) > ends[0]]
        limit = min(((p.lineno, p.col_offset) for p in following), default=(sys.maxsize, 0))
        for default in defaults:
            end = (default.end_lineno or 0, default.end_col_offset or 0)
            if ends[0] < end < limit:
                ends.append(end)
        row, col = max(ends)
        match = _COMMENT_OF_PARAMETER.match(self._source[row - 1][col:].decode("utf-8", "replace"))
        return match[1] if match is not None else ""

    def _signature(self, node: ast.FunctionDef | ast.AsyncFunctionDef, names: list[str], is_method: bool) -> None:
        row = self._end_row(node)
        on_head = node.body[0].lineno > row
        if node.type_comment is not None:
            on_head = on_head and self._comments.get(row, "").endswith(node.type_comment)
        else:
            on_head = on_head and self._hint_in(self._comments.get(row, "")) is not None
        if not on_head:
            rows = range(row + 1, node.body[0].lineno)
            row = next((r for r in rows if self._hint_in(self._comments.get(r, "")) is not None), 0)
        text = self._hint_in(self._comments.get(row, ""))
        if text is None:
            return
        rule = None
        if node.type_comment is None:
            rule = HintRule.IGNORE if text.startswith("ignore") else HintRule.BEHIND
        function = signature_of(text)
        if function is None:
            function = signature_of(re.sub(r",\s*\)(\s*->)", r")\1", text))
            rule = rule or HintRule.TRAILING_COMMA
        if function is None:
            return
        types = function.argtypes
        if len(types) == 1 and isinstance(types[0], ast.Constant) and types[0].value is ...:
            types = []
        if types and not names and on_head:
            self.without_parameters.add(self._groups.at(row))
        offset = 1 if is_method and len(types) == len(names) - 1 else 0
        for i, hint in enumerate(types):
            self._read_hint(hint, row)
            if not on_head:
                self._by_place(HintKind.SIGNATURE, f"<argument {i}>", hint, row, rule)
            elif i >= len(names):
                self._file(HintKind.SIGNATURE, f"<argument {i}>", hint, row, HintRule.SURPLUS)
            elif offset:
                self._file(HintKind.SIGNATURE, names[i + 1], hint, row, HintRule.FROM_THE_FIRST, drop=True)
                self._file(HintKind.SIGNATURE, names[i], hint, row, HintRule.FROM_THE_FIRST)
            else:
                self._file(HintKind.SIGNATURE, names[i], hint, row, rule)
        self._read_hint(function.returns, row)
        if on_head:
            self._file(HintKind.RETURN, "return", function.returns, row, rule)
        else:
            self._by_place(HintKind.RETURN, "return", function.returns, row, rule)

    def _by_place(self, kind: HintKind, name: str, hint: ast.expr, row: int, rule: HintRule | None) -> None:
        """A signature on a line of its own knows no parameters; its records are those of that line."""
        fact = Hint(name, text_of(hint), False)
        if rule is None:
            self.hints[self._groups.at(row)][fact] = kind
        else:
            self.hints_added[self._groups.at(row)].setdefault(fact, (kind, rule))


def signature_of(text: str) -> ast.FunctionType | None:
    """The signature that a comment holds."""
    try:
        function = ast.parse(text, mode="func_type")
    except (SyntaxError, ValueError):
        return None
    assert isinstance(function, ast.FunctionType)
    return function


def _in_order(arguments: ast.arguments) -> list[ast.arg]:
    found = [*arguments.posonlyargs, *arguments.args, *arguments.kwonlyargs]
    found += [argument for argument in (arguments.vararg, arguments.kwarg) if argument is not None]
    return sorted(found, key=lambda argument: (argument.lineno, argument.col_offset))


# ---- the comparison ----


def comments_of(source: str) -> dict[int, str]:
    """The comments, by row."""
    tokens = tokenize.generate_tokens(io.StringIO(source).readline)
    return {token.start[0]: token.string for token in tokens if token.type == tokenize.COMMENT}


def hints_of(lines: list[Line]) -> Iterator[Hint]:
    """The hints that were recorded."""
    for line in lines:
        for record in line.records:
            if record.kind is RecordKind.HINT:
                yield Hint(normal(record.name), same_text(record.detail), record.is_parameter)


@dataclass
class HintTally:
    """The count of one kind of hints."""

    hints: int = 0
    agreeing: int = 0
    explained: Counter[HintRule] = field(default_factory=Counter)
    unexplained: list[str] = field(default_factory=list)


@dataclass
class HintReport:
    """The count of everything in a set of sources.

    `exact` says which reading is compared; of a complete one, what only a rule of exact readings loses agrees.
    `not_python` are the files that the host refuses whatever their comments say, `misplaced` are the type
    comments in places where it takes none, `internal_errors` those of the analysis.
    """

    exact: bool = True
    files: int = 0
    not_python: int = 0
    misplaced: int = 0
    internal_errors: int = 0
    tallies: dict[HintKind, HintTally] = field(default_factory=lambda: {kind: HintTally() for kind in HintKind})
    rejected: Counter[str] = field(default_factory=Counter)
    faults: list[str] = field(default_factory=list)

    def compare(self, name: str, source: bytes, version: tuple[int, int] | None = None) -> None:
        """Adds one source, which is analysed as a version's."""
        try:
            tree, text, misplaced = _parse(to_utf8(source).decode("utf-8").removeprefix("\ufeff"))
            comments = comments_of(text)
        except (SyntaxError, ValueError, RecursionError, tokenize.TokenError, SourceEncodingError):
            self.not_python += 1
            return
        with watched() as events:
            analysis = analyze(text, version=version, exact=self.exact)
        self.files += 1
        self.misplaced += misplaced
        self.internal_errors += events.internal_errors
        lines = analysis.lines
        rows = [analysis.source_line(n) for n in range(1, (lines[-1].last_line if lines else 0) + 2)]
        groups = Groups(lines)
        expected = HintExpectation(tree, groups, rows, comments, self.exact)
        for index, group in enumerate(groups.lines):
            place = f"{name}:{group[0].first_line}: {rows[group[-1].last_line - 1].decode().strip()}"
            lost = self._why_lost(analysis, expected, index, group, place, events)
            self._compare(expected, index, group, place, lost)

    def _compare(
        self, expected: HintExpectation, index: int, lines: list[Line], place: str, lost: HintRule | None
    ) -> None:
        ours = set(hints_of(lines))
        hints, added, dropped = expected.hints[index], expected.hints_added[index], expected.hints_dropped[index]
        for hint, kind in hints.items():
            tally = self.tallies[kind]
            tally.hints += 1
            if hint in ours:
                tally.agreeing += 1
            elif lost is not None:
                tally.explained[lost] += 1
            else:
                tally.unexplained.append(f"{place}: {hint} is not recorded")
        for hint, (kind, rule) in dropped.items():
            if hint in hints:
                continue
            self.tallies[kind].hints += 1
            if hint in ours and not self.exact:
                self.tallies[kind].agreeing += 1
            elif hint in ours and hint not in added:
                self.tallies[kind].unexplained.append(f"{place}: {hint} is recorded")
            else:
                self.tallies[kind].explained[rule] += 1
        for hint, (kind, rule) in added.items():
            if hint in hints or (hint in dropped and not self.exact):
                continue
            if hint in ours:
                self.tallies[kind].explained[rule] += 1
            elif lost is None and self.exact:
                self.tallies[kind].unexplained.append(f"{place}: {hint} is not recorded")
        for hint in ours - hints.keys() - added.keys() - dropped.keys():
            self.tallies[HintKind.VARIABLE].unexplained.append(f"{place}: {hint} is recorded")
        if index in expected.with_comments and lost is None:
            self._compare_reads(expected, index, lines, place)

    def _compare_reads(self, expected: HintExpectation, index: int, lines: list[Line], place: str) -> None:
        def reads(facts: object) -> set[Fact]:
            return {fact for fact in facts if fact.kind in (Kind.READ, Kind.CHAIN)}  # type: ignore[attr-defined]

        tally = self.tallies[HintKind.READ]
        said, added = reads(expected.said[index]), reads(expected.added[index])
        in_comments = {fact for fact in added if expected.added[index][fact] is Rule.COMMENT_HINT} - said
        ours = reads(facts_of(lines))
        tally.hints += len(in_comments)
        tally.agreeing += len(in_comments & ours)
        # A string that the imports do not show to be a hint is none to a complete reading.
        due = said | (added if self.exact else in_comments)
        tally.unexplained += [f"{place}: {fact.name} is not read" for fact in due - ours]
        tally.unexplained += [f"{place}: {fact.name} is read" for fact in ours - said - added]

    def _why_lost(
        self, analysis: Analysis, expected: HintExpectation, index: int, lines: list[Line], place: str, events: Events
    ) -> HintRule | None:
        """Why records of these lines may be missing; counts what it finds."""
        errors = [line for line in lines if line.error is not None]
        for line in errors:
            titles = rejections.explain(analysis, line) if self.exact else _unread_hint(line)
            if titles is None:
                self.faults.append(f"{place}: {line.error!r}")
            else:
                self.rejected.update(titles)
        if errors:
            return HintRule.REJECTED
        if events.internal_errors and any(again(line, analysis).internal_errors for line in lines):
            if index in expected.without_parameters:
                return HintRule.NO_PARAMETERS
            if not expected.ellipses[index]:
                self.faults.append(f"{place}: internal error")
            return HintRule.BARE_ELLIPSIS
        return None

    @property
    def unexplained(self) -> list[str]:
        """Every difference that no rule explains."""
        return [text for tally in self.tallies.values() for text in tally.unexplained]

    def table(self) -> str:
        """The counts as tables of Markdown."""
        head = f"{self.files:,} files; {self.misplaced} type comments stand where Python takes none; "
        out = [f"{head}{self.internal_errors} internal errors\n\n"]
        rows = []
        for kind, tally in self.tallies.items():
            numbers = (tally.hints, tally.agreeing, sum(tally.explained.values()), len(tally.unexplained))
            rows.append([kind.value, *(f"{number:,}" for number in numbers)])
        out.append(text_table(["", "hints", "agreeing", "by a rule", "left"], rows))
        rows = []
        for rule in HintRule:
            found = [f"{n:,} {kind.value}" for kind, tally in self.tallies.items() if (n := tally.explained[rule])]
            if found:
                rows.append([rule.value, "; ".join(found)])
        rows += [[f"rejected: {title}", f"{count} statements"] for title, count in self.rejected.most_common()]
        out.append("\n" + text_table(["rule", "differences"], rows))
        return "".join(out)


def _unread_hint(line: Line) -> list[str] | None:
    """What a complete reading calls an error here: a hint that it cannot read, which costs the statement no more."""
    message = line.error.msg if line.error is not None else ""
    return [message] if line.records and "type hint" in message else None


def _parse(text: str) -> tuple[ast.Module, str, int]:
    """The tree, and the text without the `misplaced` type comments for which the host refuses it."""
    misplaced = 0
    while True:
        try:
            with warnings.catch_warnings():
                warnings.simplefilter("ignore")
                return ast.parse(text, type_comments=True), text, misplaced
        except SyntaxError as error:
            rows = text.split("\n")
            row = (error.lineno or 1) - 1
            if row >= len(rows) or not _REFUSED.search(rows[row]):
                raise
            rows[row] = _REFUSED.sub("# ", rows[row], count=1)
            text = "\n".join(rows)
            misplaced += 1


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--complete", action="store_true", help="compare the complete reading, not the exact one")
    parser.add_argument("--python", metavar="VERSION", help="the version that the sources are analysed as, such as 2.7")
    parser.add_argument("paths", nargs="+", type=Path)
    arguments = parser.parse_args()
    version = None
    if arguments.python is not None:
        major, minor = arguments.python.split(".")
        version = (int(major), int(minor))
    report = HintReport(exact=not arguments.complete)
    for path in files_of(arguments.paths):
        report.compare(str(path), path.read_bytes(), version)
    print(report.table(), end="")
    for text in [*report.unexplained, *report.faults]:
        print(text, file=sys.stderr)
    return 1 if report.unexplained or report.faults else 0


if __name__ == "__main__":
    sys.exit(main())
