"""Source lines for answers, read when they are shown, and whether the file is still what was indexed."""

from __future__ import annotations

import os
import re
from functools import cached_property
from typing import TYPE_CHECKING

from quillet._source import SourceEncodingError, to_utf8

if TYPE_CHECKING:
    from quillet.index.questions import FileRow

_LINE_END = re.compile(rb"\r\n|\r|\n")
_BOM = b"\xef\xbb\xbf"


class SourceFile:
    """A file of the index as it is on the disk now. A file that is gone has no lines, and has changed."""

    def __init__(self, path: str, row: FileRow) -> None:
        self._path = path
        self._row = row

    @cached_property
    def content(self) -> bytes | None:
        """The bytes of the file, None where it cannot be read."""
        try:
            with open(self._path, "rb") as file:
                return file.read()
        except (OSError, ValueError):
            return None

    @cached_property
    def changed(self) -> bool:
        """Whether the file is another one than the index knows."""
        try:
            status = os.stat(self._path)
        except (OSError, ValueError):
            return True
        if (status.st_size, status.st_mtime_ns) == (self._row.size, self._row.mtime_ns):
            return False
        if self.content is None:
            return True
        # Imported when a file was touched, since a question is to be answered at once.
        from hashlib import blake2b

        return blake2b(self.content, digest_size=16).digest() != self._row.hash

    @cached_property
    def lines(self) -> list[bytes]:
        """The physical lines as UTF-8, without their ends."""
        if self.content is None:
            return []
        try:
            source = to_utf8(self.content).removeprefix(_BOM)
        except SourceEncodingError:
            return []
        # By far the most files have one kind of line end, and a plain split is many times as fast.
        return _LINE_END.split(source) if b"\r" in source else source.split(b"\n")

    def line(self, number: int) -> bytes:
        """A line counted from 1, empty where there is none."""
        return self.lines[number - 1] if 0 < number <= len(self.lines) else b""
