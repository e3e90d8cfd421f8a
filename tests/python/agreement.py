"""quillet's records beside the facts of the host's `ast`, over whole sources, and a count of everything.

Run as a command it compares the library of the running interpreter, or the files and folders that it is
given, and prints the table of docs/agreement.md:

    python tests/python/agreement.py [FILE OR FOLDER...]
"""

from __future__ import annotations

import argparse
import ast
import contextlib
import io
import itertools
import re
import sys
import tokenize
import unicodedata
import warnings
from collections import Counter
from collections.abc import Iterable, Iterator
from dataclasses import dataclass, field
from pathlib import Path

if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parent.parent.parent / "scripts"))

import rejections
from expected_names import Expectation, Fact, Groups, Kind, Rule
from quillet import Analysis, Line, RecordKind, analyze
from quillet._records import decode_record
from quillet.logicalline import kFstringFieldExp
from survey import NOT_THE_LIBRARY, library_of, reports_to

_TYPE_COMMENT = re.compile(r"#\s*type:\s*(.*)")


def normal(name: str) -> str:
    """A name as the host spells it. quillet keeps the spelling of the source."""
    return name if name.isascii() else unicodedata.normalize("NFKC", name)


# ---- what quillet says ----


def facts_of(lines: Iterable[Line]) -> set[Fact]:
    facts = set()
    for line in lines:
        for record in line.records:
            fact = _fact(record.kind, normal(record.name), record.detail, record.is_parameter)
            if fact is not None:
                facts.add(fact)
    return facts


def _fact(kind: RecordKind, name: str, detail: str, is_parameter: bool) -> Fact | None:
    if kind is RecordKind.IMPORT:
        return Fact(Kind.IMPORT, f"{name}: import {normal(detail)}")
    if kind is RecordKind.IMPORT_AS:
        return Fact(Kind.IMPORT, f"{name}: as {normal(detail)}")
    if kind is RecordKind.FROM_IMPORT:
        return Fact(Kind.IMPORT, f"{name}: from {normal(detail)}")
    if not all(part.isidentifier() for part in name.split(".")):
        return None  # the text of a chain with calls, subscripts or brackets
    dotted = "." in name
    if kind is RecordKind.GET:
        return Fact(Kind.CHAIN if dotted else Kind.READ, name)
    if kind is RecordKind.SET:
        return Fact(Kind.PARAMETER if is_parameter else Kind.ATTRIBUTE if dotted else Kind.BOUND, name)
    if kind is RecordKind.CALLED:
        return Fact(Kind.CALLED, name, _count_arguments(detail))
    simple = {
        RecordKind.WITHIN_EXPR: Kind.WITHIN,
        RecordKind.GLOBAL: Kind.GLOBAL,
        RecordKind.NONLOCAL: Kind.NONLOCAL,
        RecordKind.TYPE_PARAMETER: Kind.TYPE_PARAMETER,
    }
    return Fact(simple[kind], name) if kind in simple else None


def _count_arguments(detail: str) -> int:
    try:
        call = ast.parse(f"f{detail}", mode="eval").body
    except SyntaxError:
        # The text of an argument drops the brackets of `(yield)` and the blank of `6 .real`.
        tokens = [token.string for token in tokenize.generate_tokens(io.StringIO(detail).readline)]
        depths = list(itertools.accumulate((token in "([{") - (token in ")]}") if token else 0 for token in tokens))
        return 1 + sum(token == "," and depth == 1 for token, depth in zip(tokens, depths, strict=True))
    assert isinstance(call, ast.Call), detail
    return len(call.args) + len(call.keywords)


def reads_in_fields(line: Line, analysis: Analysis) -> set[Fact]:
    """The names that the fields of the line's f-strings read, each field analysed by itself."""
    facts: set[Fact] = set()
    for field_line in line.logical.GetExpLogicals():
        if field_line.fType != kFstringFieldExp:
            continue
        analysis.analyzer.AnalyzeSingleLogical(field_line, line.in_async_def, False)
        for name, info in field_line.fTypeEquivs or ():
            record = decode_record(name, info, False)
            fact = _fact(record.kind, normal(record.name), record.detail, False)
            if fact is not None and fact.kind is Kind.READ:
                facts.add(Fact(Kind.FSTRING, fact.name))
    return facts


# ---- what happens to a statement beside its records ----


@dataclass
class Events:
    """What was reported while lines were analysed: internal errors, and walks that ended at a limit."""

    internal_errors: int = 0
    limits: int = 0


@contextlib.contextmanager
def watched() -> Iterator[Events]:
    """Counts what happens inside, and keeps it from being logged and printed."""
    events, found, printed = Events(), list[str](), io.StringIO()
    with reports_to(found), contextlib.redirect_stdout(printed):
        yield events
    events.internal_errors = len(found)
    events.limits = printed.getvalue().count("RuntimeError raised in CNodeWalker.Walk")


def again(line: Line, analysis: Analysis) -> Events:
    """What happens when a line is analysed once more."""
    with watched() as events:
        line.logical.SetParsed(False)
        analysis.analyzer.AnalyzeSingleLogical(line.logical, line.in_async_def, line.first_in_def)
    return events


# ---- the comparison ----


@dataclass
class Tally:
    """The count of one kind of facts."""

    facts: int = 0
    agreeing: int = 0
    explained: Counter[Rule] = field(default_factory=Counter)
    unexplained: list[str] = field(default_factory=list)

    @property
    def share(self) -> float:
        """The share of the facts that is recorded as it is, or otherwise by a rule."""
        return 1 - len(self.unexplained) / max(self.facts, 1)


@dataclass
class Report:
    """The count of everything in a set of sources.

    `exact` says which reading is compared; of a complete one, what only a rule of exact readings loses agrees.
    `not_python` are the files that the host does not accept; `bare_ellipses` are those of the internal
    errors that a statement with a bare `...` ends in; `faults` are rejected statements and internal errors
    for which there is no reason.
    """

    exact: bool = True
    files: int = 0
    lines: int = 0
    not_python: int = 0
    events: Events = field(default_factory=Events)
    bare_ellipses: int = 0
    tallies: dict[Kind, Tally] = field(default_factory=lambda: {kind: Tally() for kind in Kind})
    rejected: Counter[str] = field(default_factory=Counter)
    faults: list[str] = field(default_factory=list)

    def compare(self, name: str, source: bytes) -> None:
        """Adds one source."""
        try:
            with warnings.catch_warnings():
                warnings.simplefilter("ignore")
                tree = ast.parse(source)
                if not self.exact:
                    compile(source, name, "exec", dont_inherit=True)
        except (SyntaxError, ValueError, RecursionError, MemoryError):
            self.not_python += 1
            return
        with watched() as events:
            analysis = analyze(source, exact=self.exact)
        self.files += 1
        self.lines += len(analysis.lines)
        self.events.internal_errors += events.internal_errors
        self.events.limits += events.limits
        _Comparison(self, name, analysis, tree, events).run()

    @property
    def unexplained(self) -> list[str]:
        """Every difference that no rule explains."""
        return [text for tally in self.tallies.values() for text in tally.unexplained]

    def table(self) -> str:
        """The counts as tables of Markdown."""
        out = [
            f"{self.files:,} files, {self.lines:,} lines ({self.not_python} files are no Python of this version)\n\n"
        ]
        rows = []
        for kind, tally in self.tallies.items():
            numbers = (tally.facts, tally.agreeing, sum(tally.explained.values()), len(tally.unexplained))
            rows.append([kind.value, *(f"{number:,}" for number in numbers)])
        out.append(text_table(["", "facts", "agreeing", "by a rule", "left"], rows))
        counts = Counter(
            {(kind, rule): n for kind, tally in self.tallies.items() for rule, n in tally.explained.items()}
        )
        rows = []
        for rule in Rule:
            found = [f"{n:,} {kind.value}" for kind in Kind if (n := counts[kind, rule])]
            if found:
                rows.append([rule.value, ", ".join(found)])
        out.append("\n" + text_table(["rule", "differences"], rows))
        rows = [["internal error at a bare `...`", str(self.bare_ellipses)], ["walk limit", str(self.events.limits)]]
        rows += [[f"rejected: {title}", str(count)] for title, count in self.rejected.most_common()]
        out.append("\n" + text_table(["statements without records, or without all", ""], rows))
        return "".join(out)


def text_table(head: list[str], rows: list[list[str]]) -> str:
    lines = [head, ["---", *("---:" if len(head) != 2 else "---" for _ in head[1:])], *rows]
    return "".join(f"| {' | '.join(line)} |\n" for line in lines)


class _Comparison:
    """The comparison of one source."""

    def __init__(self, report: Report, name: str, analysis: Analysis, tree: ast.AST, events: Events) -> None:
        self._report = report
        self._name = name
        self._analysis = analysis
        lines = analysis.lines
        count = lines[-1].last_line + 1 if lines else 1
        self._source = [analysis.source_line(number) for number in range(1, count + 1)]
        self._groups = Groups(lines)
        self._expected = Expectation(tree, self._groups, self._source)
        self._events = events

    def run(self) -> None:
        """Compares every group of lines."""
        for index, lines in enumerate(self._groups.lines):
            ours = facts_of(lines).union(*(reads_in_fields(line, self._analysis) for line in lines))
            self._compare(index, lines, ours)

    def _compare(self, index: int, lines: list[Line], ours: set[Fact]) -> None:
        said = self._expected.said.get(index, set())
        dropped = self._expected.dropped.get(index, {})
        added = self._expected.added.get(index, {})
        missing: list[Fact] = []
        for fact in said | dropped.keys():
            tally = self._report.tallies[fact.kind]
            tally.facts += 1
            if fact in ours and (fact in said or fact in added):
                tally.agreeing += 1
            elif fact in ours and not self._report.exact:
                tally.agreeing += 1  # a rule of exact readings
            elif fact in ours:
                self._unexplained(fact, "is recorded", lines)
            elif fact in said:
                missing.append(fact)
            else:
                tally.explained[dropped[fact]] += 1
        for fact, rule in added.items():
            if fact in said or fact in dropped:
                continue
            if fact in ours:
                self._report.tallies[fact.kind].explained[rule] += 1
            elif self._report.exact:
                missing.append(fact)
        for fact in ours - said - dropped.keys() - added.keys():
            if self._is_of_comment(fact, lines):
                self._report.tallies[fact.kind].explained[Rule.COMMENT_HINT] += 1
            else:
                self._unexplained(fact, "is recorded", lines)
        reason = self._why_lost(index, lines, bool(missing))
        for fact in missing:
            if reason is None:
                self._unexplained(fact, "is not recorded", lines)
            else:
                self._report.tallies[fact.kind].explained[reason] += 1

    def _why_lost(self, index: int, lines: list[Line], is_missing: bool) -> Rule | None:
        """Why records of these lines may be missing; counts what it finds."""
        rejected = [line for line in lines if line.error is not None]
        for line in rejected:
            titles = rejections.explain(self._analysis, line)
            if titles is None:
                self._report.faults.append(f"{self._place(lines)}: {line.error!r}")
            else:
                self._report.rejected.update(titles)
        if rejected:
            return Rule.REJECTED
        if self._events.internal_errors:
            failed = sum(again(line, self._analysis).internal_errors for line in lines)
            if failed and failed == self._expected.ellipses[index]:
                self._report.bare_ellipses += failed
                return Rule.BARE_ELLIPSIS
            if failed:
                self._report.faults.append(f"{self._place(lines)}: internal error")
        if is_missing and self._events.limits and any(again(line, self._analysis).limits for line in lines):
            return Rule.WALK_LIMIT
        return None

    def _place(self, lines: list[Line]) -> str:
        rows = self._source[lines[0].first_line - 1 : lines[-1].last_line]
        text = b" ".join(row.strip() for row in rows)[:150].decode("utf-8", "replace")
        return f"{self._name}:{lines[0].first_line}: {text}"

    def _unexplained(self, fact: Fact, problem: str, lines: list[Line]) -> None:
        text = f"{self._place(lines)}: {fact.kind.value}: {fact.name!r} {problem}"
        self._report.tallies[fact.kind].unexplained.append(text)

    def _is_of_comment(self, fact: Fact, lines: list[Line]) -> bool:
        """Whether a name may come from a type comment of the lines."""
        if fact.kind not in (Kind.READ, Kind.CHAIN):
            return False
        rows = self._source[lines[0].first_line - 1 : lines[-1].last_line]
        found = (_TYPE_COMMENT.search(row.decode("utf-8", "replace")) for row in rows)
        hints = " ".join(match[1] for match in found if match is not None)
        return re.search(rf"(?<![\w.]){re.escape(fact.name)}(?!\w)", hints) is not None


# ---- the command ----


def files_of(paths: Iterable[Path]) -> list[Path]:
    """The Python files among paths and in the folders among them, in a fixed order."""
    files: list[Path] = []
    for path in paths:
        found = sorted(path.rglob("*.py")) if path.is_dir() else [path]
        files += [file for file in found if not NOT_THE_LIBRARY & set(file.relative_to(path).parts)]
    return files


def own_library(each_nth: int = 1) -> list[Path]:
    """The files of the running interpreter's library, tests included, or every n-th of them."""
    library = library_of(sys.executable)
    assert library is not None
    return library.files(each_nth)


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--complete", action="store_true", help="compare the complete reading, not the exact one")
    parser.add_argument("paths", nargs="*", type=Path, help="files and folders instead of the library")
    arguments = parser.parse_args()
    report = Report(exact=not arguments.complete)
    for path in files_of(arguments.paths) if arguments.paths else own_library():
        report.compare(str(path), path.read_bytes())
    print(report.table(), end="")
    for text in [*report.unexplained, *report.faults]:
        print(text, file=sys.stderr)
    return 1 if report.unexplained or report.faults else 0


if __name__ == "__main__":
    sys.exit(main())
