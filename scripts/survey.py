#!/usr/bin/env python3
"""Analyses the standard library of every Python that is found here and counts what is rejected, by kind.

Each library, tests included, is read as its own version. A rejected statement counts if that interpreter
compiles the file: then it is explained by one of the kinds of `rejections.py`, or it is a fault.

    scripts/survey.py                  prints the table; exit code 1 if a rejection is not explained
    scripts/survey.py --write          and puts it into docs/rejections.md
    scripts/survey.py --python 3.12    only of this version (may be repeated)

Interpreters are the running one, those of pyenv, and python2.7 and python3.x on PATH.
"""

from __future__ import annotations

import argparse
import contextlib
import io
import os
import re
import subprocess
import sys
from collections.abc import Iterator, Sequence
from dataclasses import dataclass, field
from pathlib import Path

from quillet import Analysis, Line, SourceEncodingError, analyze, reflect
from rejections import KINDS, explain

ROOT = Path(__file__).resolve().parent.parent
DOCUMENT = ROOT / "docs" / "rejections.md"
TABLE = re.compile(r"(?<=<!-- survey -->\n).*?(?=<!-- end of survey -->)", re.DOTALL)
NOT_THE_LIBRARY = {"site-packages", "dist-packages", "__pycache__"}
NO_STATEMENT = {"comment", "blank"}

_QUESTION = "import os, sys; print('%d.%d.%d' % sys.version_info[:3]); print(os.path.dirname(os.__file__))"

# Says in a line for each file whether the interpreter that runs this accepts it. Old Pythons run it, too.
_COMPILER = """
import sys, warnings
warnings.simplefilter("ignore")
for path in sys.stdin.read().splitlines():
    try:
        with open(path, "rb") as file:
            compile(file.read(), path, "exec", 0, 1)
        answer = ""
    except Exception:
        error = sys.exc_info()[1]
        answer = "%s: %s" % (type(error).__name__, error)
    print(" ".join(answer.split()))
"""


@dataclass(frozen=True)
class Library:
    """The standard library of one interpreter. `name` is its full version, such as "3.12.1"."""

    name: str
    executable: str
    root: Path

    @property
    def version(self) -> tuple[int, int]:
        """The version that its sources are written for."""
        major, minor = self.name.split(".")[:2]
        return int(major), int(minor)

    @property
    def has_tests(self) -> bool:
        """Whether its own tests are there, half of its files, which some distributions leave out."""
        return (self.root / "test" / "test_grammar.py").exists()

    def files(self, each_nth: int = 1) -> list[Path]:
        """Its sources, tests included, or every n-th of them; more of them where the tests are left out."""
        if not self.has_tests:
            each_nth = max(each_nth // 6, 1)
        found = (path for path in self.root.rglob("*.py") if not NOT_THE_LIBRARY & set(path.parts))
        paths = (path for path in found if path.is_file())
        return sorted(paths)[::each_nth]

    def refusals(self, paths: Sequence[Path]) -> dict[Path, str]:
        """Those of the files that its interpreter does not compile, and why."""
        if not paths:
            return {}
        names = "\n".join(map(str, paths))
        run = subprocess.run(
            [self.executable, "-c", _COMPILER], input=names, capture_output=True, text=True, check=True
        )
        answers = run.stdout.split("\n")[: len(paths)]
        return {path: answer for path, answer in zip(paths, answers, strict=True) if answer}


def library_of(executable: str) -> Library | None:
    """The library of an interpreter, or None where it cannot be run."""
    try:
        answer = subprocess.run([executable, "-c", _QUESTION], capture_output=True, text=True, check=True, timeout=60)
    except (OSError, subprocess.SubprocessError):
        return None
    name, root = answer.stdout.splitlines()
    return Library(name, executable, Path(root))


def libraries() -> dict[tuple[int, int], Library]:
    """One library a version, in order of versions; for its own version that of the running Python."""
    versions = [(2, 7), *((3, minor) for minor in range(6, 20))]
    pyenv = Path(os.environ.get("PYENV_ROOT", Path.home() / ".pyenv")) / "versions"
    candidates = [sys.executable, *map(str, sorted(pyenv.glob("*/bin/python"), reverse=True))]
    candidates += [f"python{major}.{minor}" for major, minor in versions]
    found: dict[tuple[int, int], Library] = {}
    for executable in candidates:
        library = library_of(executable)
        if library is not None and library.version in versions:
            found.setdefault(library.version, library)
    return dict(sorted(found.items()))


@dataclass
class Rejection:
    """A statement that is rejected in a file that Python accepts; `kinds` is None for a fault."""

    path: Path
    line: Line
    text: str
    kinds: list[str] | None

    def __str__(self) -> str:
        line, column = self.line.error_position or (0, 0)
        return f"{self.path}:{line}:{column}: {self.text.strip()}"


@dataclass
class Findings:
    """What the analysis of a library gave.

    `internal_errors` are the reports of statements that end without records, `limits` is the number of
    statements whose walk ended at its limit, `unreadable` are files whose encoding only Python can read.
    """

    library: Library
    files: int = 0
    statements: int = 0
    refused: dict[Path, str] = field(default_factory=dict)
    rejections: list[Rejection] = field(default_factory=list)
    internal_errors: list[str] = field(default_factory=list)
    limits: int = 0
    unreadable: list[Path] = field(default_factory=list)

    @property
    def unexplained(self) -> list[Rejection]:
        """The faults."""
        return [rejection for rejection in self.rejections if rejection.kinds is None]

    def count(self, title: str) -> int:
        """The number of statements of a kind."""
        return sum(title in (rejection.kinds or ()) for rejection in self.rejections)


@contextlib.contextmanager
def reports_to(found: list[str]) -> Iterator[None]:
    """Collects what the analysis reports as internal errors."""
    report = reflect.ReportCurrentException

    def collect(suppress_gui: bool = False) -> None:
        del suppress_gui
        found.append(str(sys.exc_info()[1]))

    reflect.ReportCurrentException = collect
    try:
        yield
    finally:
        reflect.ReportCurrentException = report


def survey(library: Library, each_nth: int = 1) -> Findings:
    """Analyses a library, or every n-th file of it."""
    findings = Findings(library)
    with_errors: dict[Path, Analysis] = {}
    printed = io.StringIO()
    with reports_to(findings.internal_errors), contextlib.redirect_stdout(printed):
        for path in library.files(each_nth):
            findings.files += 1
            try:
                analysis = analyze(path.read_bytes(), version=library.version, exact=True)
            except SourceEncodingError:
                findings.unreadable.append(path)
                continue
            findings.statements += sum(line.logical.fType not in NO_STATEMENT for line in analysis.lines)
            if analysis.errors:
                with_errors[path] = analysis
    findings.limits = printed.getvalue().count("raised in CNodeWalker.Walk")
    findings.refused = library.refusals([*with_errors, *findings.unreadable])
    findings.unreadable = [path for path in findings.unreadable if path not in findings.refused]
    for path, analysis in with_errors.items():
        if path in findings.refused:
            continue
        for line in analysis.errors:
            number, _ = line.error_position or (0, 0)
            text = analysis.source_line(number).decode("utf-8", "replace")
            findings.rejections.append(Rejection(path, line, text, explain(analysis, line)))
    return findings


def _first_place(all_findings: Sequence[Findings], title: str) -> str:
    for findings in reversed(all_findings):
        for rejection in findings.rejections:
            if title in (rejection.kinds or ()):
                line, _ = rejection.line.error_position or (0, 0)
                place = rejection.path.relative_to(findings.library.root).as_posix()
                return f"{findings.library.name}: `{place}:{line}`"
    return ""


def table(all_findings: Sequence[Findings]) -> str:
    """The findings as a table of Markdown: a column a library, a row a kind that was met."""
    rows = [["", *(findings.library.name for findings in all_findings), "the first one"]]
    rows.append(["files", *(f"{findings.files:,}" for findings in all_findings), ""])
    rows.append(["statements", *(f"{findings.statements:,}" for findings in all_findings), ""])
    rows.append(["rejected", *(f"{len(findings.rejections):,}" for findings in all_findings), ""])
    for kind in KINDS:
        counts = [findings.count(kind.title) for findings in all_findings]
        if any(counts):
            rows.append([kind.title, *(str(count or "") for count in counts), _first_place(all_findings, kind.title)])
    faults = [len(findings.unexplained) for findings in all_findings]
    if any(faults):
        rows.append(["not explained", *map(str, faults), ""])
    reported = [len(findings.internal_errors) for findings in all_findings]
    rows.append(["without records: `match ...:`", *(str(count or "") for count in reported), ""])
    limits = [findings.limits for findings in all_findings]
    rows.append(["walk ended at its limit", *(str(count or "") for count in limits), ""])
    widths = [max(len(row[column]) for row in rows) for column in range(len(rows[0]))]
    align = ["left", *("right" for _ in all_findings), "left"]
    sides = list(zip(widths, align, strict=True))
    rule = ["-" * width if side == "left" else "-" * (width - 1) + ":" for width, side in sides]

    def text(row: Sequence[str]) -> str:
        cells = (c.ljust(w) if side == "left" else c.rjust(w) for c, (w, side) in zip(row, sides, strict=True))
        return f"| {' | '.join(cells)} |\n"

    return "".join([text(rows[0]), text(rule), *map(text, rows[1:])])


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--python", action="append", metavar="VERSION", help="only this version, such as 3.12")
    parser.add_argument("--write", action="store_true", help="put the table into docs/rejections.md")
    parser.add_argument("--each-nth", type=int, default=1, metavar="N", help="only every N-th file")
    arguments = parser.parse_args()
    wanted = {tuple(map(int, version.split("."))) for version in arguments.python or ()}
    all_findings = []
    for version, library in libraries().items():
        if not wanted or version in wanted:
            all_findings.append(survey(library, arguments.each_nth))
            for rejection in all_findings[-1].unexplained:
                print(rejection, file=sys.stderr)
    print(table(all_findings), end="")
    if arguments.write:
        text = DOCUMENT.read_text(encoding="utf-8")
        DOCUMENT.write_text(TABLE.sub(lambda _: table(all_findings), text), encoding="utf-8")
    return 1 if any(findings.unexplained for findings in all_findings) else 0


if __name__ == "__main__":
    sys.exit(main())
