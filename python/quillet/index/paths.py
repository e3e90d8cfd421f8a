"""Paths as the index keeps them: from its own folder where a file lies below it, absolute elsewhere.

So an index may be moved together with its folder. They are bytes, since names on a disk need be no text.
"""

from __future__ import annotations

import os


def stored_path(path: str, base: str) -> bytes:
    """A path as the index in the folder `base` keeps it."""
    path = os.path.abspath(path)
    if is_below(path, base):
        path = os.path.relpath(path, base)
    return os.fsencode(path.replace(os.sep, "/"))


class StoredPaths:
    """`stored_path` for many files, of which those of a folder come together."""

    def __init__(self, base: str) -> None:
        self._base = base
        self._folder: str | None = None
        self._prefix = b""

    def __call__(self, path: str) -> bytes:
        folder, name = os.path.split(path)
        if name in ("", ".", ".."):
            return stored_path(path, self._base)
        if folder != self._folder:
            self._folder = folder
            stored = stored_path(folder or ".", self._base)
            self._prefix = b"" if stored == b"." else stored.rstrip(b"/") + b"/"
        return self._prefix + os.fsencode(name)


def full_path(stored: bytes, base: str) -> str:
    """The absolute path of a file that the index names."""
    return os.path.normpath(os.path.join(base, os.fsdecode(stored)))


def is_below(path: str, folder: str) -> bool:
    """Whether an absolute path is a folder or stands in it."""
    return path == folder or path.startswith(folder.rstrip(os.sep) + os.sep)
