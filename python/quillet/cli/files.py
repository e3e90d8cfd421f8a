"""Which files a command reads: the arguments, with each folder walked in sorted order by the core
(core/project/find_files.h says what it gives). An argument is read whatever excludes it.
"""

from __future__ import annotations

import errno
import os
import re
import stat
from collections.abc import Iterable, Iterator, Sequence
from typing import NamedTuple

from quillet.index.paths import pattern_lines

_PIECE = 1 << 20


class Found(NamedTuple):
    """A path to read, or one that cannot be, with the reason in `problem`."""

    path: str
    problem: str | None = None


def find_files(paths: Sequence[str], *, gitignore: bool, exclude: Iterable[str] = ()) -> Iterator[Found]:
    """The files of the arguments, in their order; links to files come last. "-" passes as it is.

    `exclude` are patterns as in a .gitignore file of each folder that is an argument; they overrule those
    files.
    """
    for file in walk(paths, gitignore=gitignore, exclude=exclude):
        yield Found(os.fsdecode(file[0]), file[1])


def walk(
    paths: Sequence[str], *, gitignore: bool, exclude: Iterable[str] = ()
) -> Iterator[tuple[bytes, str | None, int, int, int, int]]:
    """The same with what is known of each file: its path, why it cannot be read, the number of its argument, where the
    path goes on below that (0 for the argument itself), and for files below a folder size and time in ns.
    """
    from quillet.tarvex import _host

    arguments = [os.fsencode(path) for path in paths]
    yield from _host.FindFiles(arguments, gitignore, pattern_lines(exclude))


def pipe_problem(mode: int) -> str | None:
    """What keeps a file of this mode from being read more than once."""
    return "is a pipe" if stat.S_ISFIFO(mode) else "is a socket" if stat.S_ISSOCK(mode) else None


class Exclusion:
    """Which files patterns leave out of a folder that is not walked. `excludes` takes a path from the folder on, with
    slashes.
    """

    def __init__(self, patterns: Iterable[str]) -> None:
        from quillet.tarvex import _host

        self._rules = _host.IgnoreRules(pattern_lines(patterns))
        self._folders: dict[bytes, bool] = {}

    def excludes(self, path: bytes) -> bool:
        """Whether a file is left out, itself or with a folder around it."""
        folder = path.rpartition(b"/")[0]
        known = self._folders.get(folder)
        if known is None:
            ends = (match.start() for match in re.finditer(rb"/", path))
            known = self._folders[folder] = any(self._rules.Verdict(path[:end], True) for end in ends)
        return known or self._rules.Verdict(path, False) is True


def read_file(path: str) -> bytes:
    """The bytes of a file, of standard input for "-". Raises OSError, also for more than the core reads of a file."""
    from quillet.tarvex import _host

    with open(0 if path == "-" else path, "rb", closefd=path != "-") as file:
        if problem := _host.DeviceProblem(file.fileno()):
            raise OSError(errno.EINVAL, problem)
        pieces = []
        size = 0
        while piece := file.read(_PIECE):
            pieces.append(piece)
            size += len(piece)
            if size > _host.MOST_BYTES_READ:
                raise OSError(errno.EFBIG, f"the source is too large: more than {_host.MOST_BYTES_READ >> 20} MiB")
        return b"".join(pieces)


def problem_of(error: OSError | ValueError) -> str:
    """The reason of a failure to read, as one phrase."""
    return (error.strerror if isinstance(error, OSError) else None) or str(error)
