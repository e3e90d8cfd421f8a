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
# How a device is opened to be looked at, as far as the system has such flags.
_QUIETLY = getattr(os, "O_NONBLOCK", 0) | getattr(os, "O_NOCTTY", 0) | getattr(os, "O_CLOEXEC", 0)


class Found(NamedTuple):
    """A path to read, or one that cannot be, with the reason in `problem`."""

    path: str
    problem: str | None = None


class Walked(NamedTuple):
    """A file as the core finds it. `below` is where the path goes on below its argument, 0 for the argument itself;
    size and time are those of files below a folder.
    """

    path: bytes
    problem: str | None
    argument: int
    below: int
    size: int
    mtime_ns: int


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
    """The same with what is known of each file, the fields of `Walked`."""
    from quillet.tarvex import _host

    arguments = [os.fsencode(path) for path in paths]
    for file in _host.FindFiles(arguments, gitignore, pattern_lines(exclude)):
        if file[3] == 0 and file[1] is None and file[0] != b"-":
            file = Walked(*file)._replace(problem=device_problem(paths[file[2]]))
        yield file


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
        problem = device_problem(file.fileno())
        if problem is not None:
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


def device_problem(file: int | str) -> str | None:
    """Why a file, by path or descriptor, is not to be read to its end: a device need not have one."""
    try:
        status = os.stat(file)
    except (OSError, ValueError):
        return None  # whoever reads it says why not
    if stat.S_ISBLK(status.st_mode):
        return "is a block device"
    if not stat.S_ISCHR(status.st_mode) or os.path.samestat(status, os.stat(os.devnull)):
        return None
    return None if _is_terminal(file) else "is a device"


def _is_terminal(file: int | str) -> bool:
    if isinstance(file, int):
        return os.isatty(file)
    try:
        descriptor = os.open(file, os.O_RDONLY | _QUIETLY)
    except OSError:
        return False
    try:
        return os.isatty(descriptor)
    finally:
        os.close(descriptor)
