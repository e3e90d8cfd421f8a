"""Edits of files: what they make of each, as a unified diff or written.

The bytes of a file stay what they are but for the edits: line ends, a byte order mark, and the encoding that it names
for itself.
"""

from __future__ import annotations

import difflib
import re
from collections.abc import Iterable
from itertools import groupby

from quillet._source import named_encoding, to_utf8
from quillet._workspace import Edit

_LINE_END = re.compile(rb"\r\n|\r|\n")
_MARK = b"\xef\xbb\xbf"


class FileEdits:
    """A file before and after its edits."""

    def __init__(self, path: str, edits: list[Edit]) -> None:
        self.path = path
        with open(path, "rb") as file:
            self._before = file.read()
        utf8 = to_utf8(self._before)
        after = _edited(utf8, edits)
        self._after = after if utf8 == self._before else self._encoded(utf8, after)

    def _encoded(self, utf8: bytes, after: bytes) -> bytes:
        """What is written for a source that is not UTF-8. Raises `ValueError` where its encoding does not lead back."""
        encoding = named_encoding(self._before)
        try:
            if encoding is not None and utf8.decode().encode(encoding) == self._before:
                return after.decode().encode(encoding)
        except (LookupError, UnicodeError):
            pass
        raise ValueError(f"{self.path}: cannot be written in the encoding that it has")

    def write(self) -> None:
        with open(self.path, "wb") as file:
            file.write(self._after)

    def diff(self, name: str) -> bytes:
        """A unified diff as `patch` takes it."""
        label = name.encode("utf-8", "surrogateescape").lstrip(b"/")
        before, after = (text.splitlines(keepends=True) for text in (self._before, self._after))
        lines = difflib.diff_bytes(difflib.unified_diff, before, after, b"a/" + label, b"b/" + label)
        return b"".join(line if line.endswith(b"\n") else line + b"\n\\ No newline at end of file\n" for line in lines)


def edited_files(edits: Iterable[Edit]) -> list[FileEdits]:
    """The files that edits change, which come in the order of files. Raises `OSError` and `ValueError`."""
    return [FileEdits(path, list(group)) for path, group in groupby(edits, key=lambda edit: edit.path)]


def _edited(source: bytes, edits: Iterable[Edit]) -> bytes:
    mark = _MARK if source.startswith(_MARK) else b""
    starts = [len(mark), *(match.end() for match in _LINE_END.finditer(source))]

    def offset(line: int, column: int) -> int:
        if line > len(starts):
            raise ValueError(f"line {line} is not there any more")
        return starts[line - 1] + column - 1

    # From the end, so that what is in front keeps its place.
    ranges = [
        (offset(edit.line, edit.column), offset(edit.end_line or edit.line, edit.end_column), edit.text)
        for edit in edits
    ]
    for begin, end, text in sorted(ranges, reverse=True):
        source = source[:begin] + text.encode("utf-8", "surrogateescape") + source[end:]
    return source
