"""Golden files: source -> tree -> records, many cases a file.

A file is a list of cases. A line "=== title" begins one, with a version in brackets at the end where it
is not 3.12; then its source, and what the code makes of it:

    === a name bound to a name [3.8]
    x = y
    --- tree
    CExprStmt expr_stmt
      ...
    --- records
    x  :s:  set
    ...

A file named fail_*.txt holds statements that are rejected: the tree is replaced by "--- error" with
line, column and message.
"""

from __future__ import annotations

import re
from dataclasses import dataclass
from pathlib import Path

from doc_examples import records_view
from quillet import analyze
from quillet._trees import tree_text

FOLDER = Path(__file__).resolve().parent.parent / "golden"
_TITLE = re.compile(r"=== (?P<title>.+?)(?: \[(?P<major>\d)\.(?P<minor>\d+)\])?")


@dataclass(frozen=True)
class Case:
    """One case as its file has it."""

    head: str
    source: str
    expected: str

    @property
    def version(self) -> tuple[int, int]:
        match = _TITLE.fullmatch(self.head)
        assert match is not None, self.head
        return (int(match["major"]), int(match["minor"])) if match["major"] else (3, 12)

    def actual(self) -> str:
        """What the code makes of the source, in the form of `expected`."""
        analysis = analyze(self.source, version=self.version, exact=True)
        out = []
        if analysis.errors:
            out.append("--- error\n")
            for line in analysis.errors:
                assert line.error is not None
                row, column = line.error_position or (0, 0)
                out.append(f"{row}:{column}: {line.error.msg}\n")
        else:
            out.append("--- tree\n")
            out += [tree_text(line, analysis.analyzer) for line in analysis.lines]
        records = records_view(self.source, self.version, "", exact=True)
        if records or not analysis.errors:
            out.append("--- records\n" + records)
        return "".join(out)

    def text(self) -> str:
        return f"{self.head}\n{self.source}{self.actual()}"


def files() -> list[Path]:
    return sorted(FOLDER.glob("*.txt"))


def read(path: Path) -> tuple[str, list[Case]]:
    """What stands in front of the first case, and the cases."""
    preamble, *parts = re.split(r"^(?==== )", path.read_text(encoding="utf-8"), flags=re.MULTILINE)
    cases = []
    for part in parts:
        head, _, body = part.partition("\n")
        source, *expected = re.split(r"^(?=--- )", body, maxsplit=1, flags=re.MULTILINE)
        cases.append(Case(head, source.rstrip("\n") + "\n", "".join(expected).rstrip("\n") + "\n"))
    return preamble, cases


def write(path: Path) -> None:
    """Rewrites a file from what the code does now."""
    preamble, cases = read(path)
    path.write_text(preamble + "\n".join(case.text() for case in cases), encoding="utf-8")
