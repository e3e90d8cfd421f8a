"""Paths as the index keeps them: from its own folder where a file lies below it, absolute elsewhere.

So an index may be moved together with its folder. They are bytes, since names on a disk need be no text.
"""

from __future__ import annotations

import os

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterable


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


def prefix_of(folder: str, base: str) -> bytes:
    """What stands in front of the paths below a folder, as the index keeps them."""
    stored = stored_path(folder, base)
    return b"" if stored == b"." else stored.rstrip(b"/") + b"/"


def trusted_roots(stored: Iterable[str], base: str) -> tuple[tuple[str, ...], tuple[str, ...]]:
    """The roots that an index names, apart into those of its own folder and others, which may be anybody's."""
    paths = [full_path(os.fsencode(root), base) for root in stored]
    inside = tuple(path for path in paths if is_below(os.path.realpath(path), os.path.realpath(base)))
    return inside, tuple(path for path in paths if path not in inside)


def pattern_lines(patterns: Iterable[str]) -> bytes:
    """Patterns as the text of a .gitignore file; one is never a comment."""
    lines = [f"\\{pattern}" if pattern.startswith("#") else pattern for pattern in patterns]
    return b"\n".join(map(os.fsencode, lines))
