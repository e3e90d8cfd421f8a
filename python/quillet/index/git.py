"""Leaves an index out of git: by a line in the repository's own list of what is excluded.

That list, `info/exclude`, is the owner's alone and part of no commit. The trap: `.git` may have come from
somewhere, and lead anywhere. A line is added to a file that is no link, in a repository that
knows the folder as its own; anything else is let be, and nothing is lost by it but a line in `git status`.
"""

from __future__ import annotations

import os
import stat

_NOTE = b"# the index of quillet"


def keep_out_of_git(index: str) -> None:
    """Adds an index and what lies beside it to what the repository around it leaves out."""
    folder, name = os.path.split(os.path.abspath(index))
    root = folder
    while not os.path.lexists(os.path.join(root, ".git")):
        parent = os.path.dirname(root)
        if parent == root:
            return
        root = parent
    try:
        repository = _repository_of(root)
        if repository is not None:
            place = os.path.relpath(folder, root).replace(os.sep, "/")
            pattern = "/" + ("" if place == "." else place + "/") + name
            if not any(char in pattern for char in "*?[\\\n\r"):
                _add_line(os.path.join(repository, "info", "exclude"), pattern + "*")
    except (OSError, UnicodeError):
        pass


def _repository_of(root: str) -> str | None:
    """The folder of the repository whose files lie in `root`, by git's own files; None where it is unclear."""
    at = os.path.join(root, ".git")
    mode = os.lstat(at).st_mode
    if stat.S_ISDIR(mode):
        return at
    if not stat.S_ISREG(mode):
        return None
    # A further working tree: its folder in the repository names it back.
    with open(at, encoding="utf-8") as file:
        key, _, place = file.read(4096).strip().partition(": ")
    place = os.path.join(root, place)
    with open(os.path.join(place, "gitdir"), encoding="utf-8") as file:
        back = file.read(4096).strip()
    if key != "gitdir" or os.path.realpath(back) != os.path.realpath(at):
        return None
    with open(os.path.join(place, "commondir"), encoding="utf-8") as file:
        repository = os.path.normpath(os.path.join(place, file.read(4096).strip()))
    is_its_own = os.path.realpath(os.path.join(place, os.pardir, os.pardir)) == os.path.realpath(repository)
    return repository if is_its_own else None


def _add_line(path: str, line: str) -> None:
    if os.path.islink(os.path.dirname(path)) or os.path.islink(path):
        return
    flags = os.O_RDWR | os.O_APPEND | os.O_CREAT | getattr(os, "O_NOFOLLOW", 0) | getattr(os, "O_NONBLOCK", 0)
    with open(os.open(path, flags, 0o666), "r+b", buffering=0) as file:
        if not stat.S_ISREG(os.fstat(file.fileno()).st_mode):
            return
        before = file.read()
        encoded = os.fsencode(line)
        if encoded not in before.splitlines():
            end = b"" if not before or before.endswith(b"\n") else b"\n"
            file.write(end + _NOTE + b"\n" + encoded + b"\n")
