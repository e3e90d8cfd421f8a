"""Paths as the index keeps them: from its own folder where a file lies below it, absolute elsewhere.

So an index may be moved together with its folder. They are bytes, since names on a disk need be no text.
What an index says of paths is not to be trusted: `Places` tells which of them may be looked at.
"""

from __future__ import annotations

import os
from collections.abc import Iterable


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


class Places:
    """The folders whose files may be shown: that of the index, and those that were named in this run."""

    def __init__(self, base: str, roots: Iterable[str]) -> None:
        self._base = base
        self._roots = [os.path.abspath(root) for root in roots]
        self._real: list[str] | None = None
        # Folders of files by their path, and whether they lie below one of the real folders.
        self._folders: dict[str, bool] = {}

    def path_of(self, stored: bytes) -> str | None:
        """The absolute path of a file by its name in the index, None where it leads elsewhere."""
        if stored.startswith(b"/") or (os.sep == "\\" and os.path.isabs(os.fsdecode(stored))):
            path = os.path.normpath(os.fsdecode(stored))
            return path if any(is_below(path, root) for root in self._roots) else None
        if not stored or b".." in stored.split(b"/") or b"\0" in stored or (os.sep != "/" and b"\\" in stored):
            return None
        return self._base.rstrip(os.sep) + os.sep + os.fsdecode(stored)

    def holds(self, path: str) -> bool:
        """Whether such a path does not leave the folders by a link, either. Looks at the disk."""
        if os.path.islink(path):
            return self._is_real_below(os.path.realpath(path))
        folder = os.path.dirname(path)
        known = self._folders.get(folder)
        if known is None:
            known = self._folders[folder] = self._is_real_below(os.path.realpath(folder))
        return known

    def _is_real_below(self, path: str) -> bool:
        if self._real is None:
            self._real = [os.path.realpath(folder) for folder in (self._base, *self._roots)]
        return any(is_below(path, folder) for folder in self._real)
