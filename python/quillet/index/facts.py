"""What the index takes of files: their records with places and scopes, syntax errors, and what opens a scope.

This is the one place that asks the engine. The sources are handed over as they were read, so that the
hash that the index keeps is that of the bytes that were analysed.
"""

from __future__ import annotations

from collections.abc import Iterator, Sequence
from typing import NamedTuple

from quillet.index.store import CLASS, FUNCTION

# line, column, scope, name, kind, detail, is_parameter
Fact = tuple[int, int, str, str, str, str, bool]

_OPENS = {"class": CLASS, "def": FUNCTION}


class FileFacts(NamedTuple):
    """One file's facts, or in `problem` the reason why it could not be read as source."""

    facts: Sequence[Fact]
    opens: dict[tuple[int, int], int]
    errors: list[tuple[int, int, str]]
    lines: int
    problem: str | None


def facts_of_files(sources: list[tuple[str, bytes]], version: tuple[int, int], jobs: int | None) -> Iterator[FileFacts]:
    """The facts of files by path and content, in their order."""
    from quillet import analyze_files

    with analyze_files(sources, version=version, jobs=jobs) as results:
        for result in results:
            opens = {(row.line, row.column): _OPENS.get(row.kind, 0) for row in result.definitions}
            errors = sorted([*result.errors, *result.reports])
            facts = result.records.plain() if result.problem is None else []
            yield FileFacts(facts, opens, errors, result.lines, result.problem)
