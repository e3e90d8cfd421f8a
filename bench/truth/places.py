"""Places in files, and the texts of files, as all runners and engines here use them.

A line counts from 1 and a column from 0, in characters. Each engine translates to what it speaks itself.
"""

from __future__ import annotations

import re
from pathlib import Path
from typing import NamedTuple

_LINE_END = re.compile(r"\r\n|\r|\n")


class Place(NamedTuple):
    """Where a name begins."""

    path: str
    line: int
    column: int

    def __str__(self) -> str:
        return f"{Path(self.path).name}:{self.line}:{self.column}"


class Found(NamedTuple):
    """A place of an answer, and how it is known. `end` is the column behind the name."""

    path: str
    line: int
    column: int
    end: int
    certainty: str = "certain"
    role: str = ""
    kind: str = ""

    @property
    def place(self) -> Place:
        return Place(self.path, self.line, self.column)

    def __str__(self) -> str:
        return f"{self.place} ({self.certainty})"


class Call(NamedTuple):
    """A function that calls, or is called, and where it does so; without `sites` it is not said where."""

    function: Found
    sites: list[Place]
    name: str = ""


class Change(NamedTuple):
    """A piece of a line that a rename replaces."""

    path: str
    line: int
    column: int
    end: int
    text: str


class Texts:
    """The lines of files as an engine sees them: open buffers first."""

    def __init__(self) -> None:
        self._lines: dict[str, list[str]] = {}

    def Lines(self, path: str) -> list[str]:
        lines = self._lines.get(path)
        if lines is None:
            lines = self._lines[path] = Cut(ReadText(path))
        return lines

    def Line(self, path: str, line: int) -> str:
        lines = self.Lines(path)
        return lines[line - 1] if 0 < line <= len(lines) else ""

    def Open(self, path: str, text: str) -> None:
        self._lines[path] = Cut(text)

    def Close(self, path: str) -> None:
        self._lines.pop(path, None)


def Cut(text: str) -> list[str]:
    """The lines of a text, without their ends."""
    return _LINE_END.split(text)


def ReadText(path: str | Path) -> str:
    try:
        return Path(path).read_bytes().decode("utf-8-sig", "replace")
    except OSError:
        return ""
