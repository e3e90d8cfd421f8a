"""What `quillet analyze` writes: text for people, or JSON lines for programs.

Both writers are given one file's analysis at a time and return the text for it. docs/cli.md describes
the two formats.
"""

from __future__ import annotations

import json
from typing import Protocol

from quillet._records import describe
from quillet.cli.show import Style, error_text, printable, statement_text, width
from quillet.host import Analysis, Line

# The `schema` of the first line; raised where a key changes its meaning or goes.
JSON_SCHEMA = 1
# Records of one statement are set in columns; a name longer than this takes its own width.
_NAME_WIDTH = 20


class Writer(Protocol):
    """A format."""

    def header(self) -> str:
        """What stands in front of the first file."""

    def file(self, path: str, analysis: Analysis) -> str:
        """What is said of one file."""


class TextWriter:
    """`path:line: statement`, and its records indented below it; errors with source and caret."""

    def __init__(self, *, errors_only: bool, style: Style) -> None:
        self._errors_only = errors_only
        self._style = style

    def header(self) -> str:
        return ""

    def file(self, path: str, analysis: Analysis) -> str:
        out: list[str] = []
        for line in analysis.errors if self._errors_only else analysis.lines:
            if line.error is not None:
                row, column = line.error_position or (line.first_line, 1)
                out.append(error_text(path, analysis, row, column, line.error.msg, self._style))
            else:
                self._add_records(out, path, analysis, line)
        return "".join(out)

    def _add_records(self, out: list[str], path: str, analysis: Analysis, line: Line) -> None:
        records = line.records
        if not records:
            return
        out.append(statement_text(path, analysis, line, self._style))
        for record in records:
            name = printable(record.name)
            blanks = " " * max(_NAME_WIDTH - width(name), 2)
            out.append(f"    {self._style.name(name)}{blanks}{printable(describe(record))}\n")


class JsonWriter:
    """One JSON object a line: first the schema, then a statement each."""

    def __init__(self, *, errors_only: bool, version: tuple[int, int]) -> None:
        self._errors_only = errors_only
        self._version = version
        self._encode = json.JSONEncoder(ensure_ascii=True, separators=(",", ":")).encode

    def header(self) -> str:
        python = "{}.{}".format(*self._version)
        return self._encode({"type": "header", "schema": JSON_SCHEMA, "python": python}) + "\n"

    def file(self, path: str, analysis: Analysis) -> str:
        out: list[str] = []
        for line in analysis.errors if self._errors_only else analysis.lines:
            error = line.error
            records = line.records
            if error is None and not records:
                continue
            row: dict[str, object] = {
                "type": "line",
                "path": path,
                "first_line": line.first_line,
                "last_line": line.last_line,
                "indent": line.indent,
                "kind": line.logical.fType,
                "in_async_def": line.in_async_def,
                "first_in_def": line.first_in_def,
                "records": [
                    {"name": name, "kind": kind.value, "detail": detail, "is_parameter": is_parameter}
                    for name, kind, detail, is_parameter in records
                ],
            }
            if error is not None:
                at, column = line.error_position or (line.first_line, 1)
                row["error"] = {"message": error.msg, "line": at, "column": column}
            out.append(self._encode(row))
            out.append("\n")
        return "".join(out)
