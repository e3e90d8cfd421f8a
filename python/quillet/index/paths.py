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


def full_path(stored: bytes, base: str) -> str:
    """The absolute path of a file that the index names."""
    return os.path.normpath(os.path.join(base, os.fsdecode(stored)))


def is_below(path: str, folder: str) -> bool:
    """Whether an absolute path is a folder or stands in it."""
    return path == folder or path.startswith(folder.rstrip(os.sep) + os.sep)
