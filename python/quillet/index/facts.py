"""What the index takes of a file: its records with their places and scopes, its syntax errors, its length.

This is the one place that asks the engine.
"""

from __future__ import annotations

import re
from collections.abc import Iterator, Sequence
from typing import NamedTuple

from quillet.index.store import CLASS, FUNCTION

# line, column, scope, name, kind, detail, is_parameter, opens
Fact = tuple[int, int, str, str, str, str, bool, int]


class FileFacts(NamedTuple):
    """One file's facts, or the reason why it could not be read as source."""

    facts: Sequence[Fact]
    errors: list[tuple[int, int, str]]
    lines: int
    problem: str | None


def facts_of_files(paths: list[str], version: tuple[int, int], jobs: int | None) -> Iterator[FileFacts]:
    """The facts of files, in their order."""
    from quillet import SourceEncodingError, analyze

    del jobs
    for path in paths:
        try:
            with open(path, "rb") as file:
                analysis = analyze(file.read(), version=version)
        except OSError as error:
            yield FileFacts((), [], 0, error.strerror or str(error))
            continue
        except SourceEncodingError as error:
            yield FileFacts((), [], 0, str(error))
            continue
        facts: list[Fact] = []
        scopes: list[tuple[int, str]] = []
        for line in analysis.lines:
            records = line.records
            if not records:
                continue
            while scopes and scopes[-1][0] >= line.indent:
                scopes.pop()
            scope = scopes[-1][1] if scopes else ""
            inner = scope
            if line.logical.fType in ("def", "class"):
                inner = f"{scope}.{records[0].name}" if scope else records[0].name
                scopes.append((line.indent, inner))
            opens = {"class": CLASS, "def": FUNCTION}.get(line.logical.fType, 0)
            text = analysis.source_line(line.first_line).decode("utf-8", "replace")
            for name, kind, detail, is_parameter in records:
                match = re.search(rf"(?<!\w){re.escape(name)}(?!\w)", text)
                column = len(text[: match.start()].encode()) + 1 if match else line.indent + 1
                facts.append(
                    (line.first_line, column, inner if is_parameter else scope, name, kind.value, detail, is_parameter, opens)
                )
                opens = 0
        errors = [(*(line.error_position or (1, 1)), line.error.msg if line.error else "") for line in analysis.errors]
        yield FileFacts(facts, errors, analysis.source.count(b"\n"), None)
