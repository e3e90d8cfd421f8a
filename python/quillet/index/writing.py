"""How an index is written: beside itself and then put in its place, by one run at a time.

Whatever moment a run ends at, the index is the old one or the new one, and who asks never waits. The lock is on
a file beside the index; the system drops it with the process. No link is followed where something is
written.
"""

from __future__ import annotations

import os
import stat
import sys
from collections.abc import Callable, Iterator
from contextlib import contextmanager, suppress

from quillet.index.store import IndexProblem, Settings, explained, settings_text
from quillet.tarvex import _host

_NO_FOLLOW = getattr(os, "O_NOFOLLOW", 0) | getattr(os, "O_BINARY", 0) | getattr(os, "O_CLOEXEC", 0)


def write_index(path: str, writer: _host.NameIndexWriter, settings: Settings) -> None:
    """Puts a new index in the place of an old one. The caller holds the lock. Raises `IndexProblem`."""
    data = writer.Finish(settings_text(settings))
    unfinished = path + ".new"
    with explained(path):
        with suppress(FileNotFoundError):
            os.unlink(unfinished)
        # Made here and now, so that it is no link to somewhere else.
        descriptor = os.open(unfinished, os.O_WRONLY | os.O_CREAT | os.O_EXCL | _NO_FOLLOW, 0o666)
        try:
            with open(descriptor, "wb") as file:
                file.write(data)
            os.replace(unfinished, path)
        except BaseException:
            os.unlink(unfinished)
            raise


def check_place(path: str) -> None:
    """Raises `IndexProblem` where no index can be written at a path, or should not."""
    folder = os.path.dirname(os.path.abspath(path))
    if not os.path.isdir(folder):
        raise IndexProblem(f"{path}: there is no folder {folder} to hold it")
    with explained(path):
        try:
            mode = os.lstat(path).st_mode
        except FileNotFoundError:
            return
    if stat.S_ISDIR(mode):
        raise IndexProblem(f"{path}: is a folder; name a file with -o")
    if stat.S_ISLNK(mode):
        raise IndexProblem(f"{path}: is a link, which is not followed; delete it, or name a file with -o")
    if not stat.S_ISREG(mode):
        raise IndexProblem(f"{path}: is no index of quillet; name another file with -o, or delete this one")


def engine_mark() -> str:
    """What tells one build of the engine from another, whose words of a file may be others.

    It is the same for two installations of one build, which would otherwise undo each other's work in turn.
    """
    from quillet import tarvex

    with open(tarvex.__file__ or sys.executable, "rb") as file:
        return f"{_host.HashOfSource(file.read()):016x}"


# ---- the lock ----


@contextmanager
def write_lock(path: str, waiting: Callable[[], None]) -> Iterator[None]:
    """Waits until no other run writes the index; `waiting` is called once where there is one.

    The lock is on a file beside the index, which stays: to delete it would give two runs a lock each.
    """
    lock = path + ".lock"
    with explained(lock):
        if os.path.islink(lock):
            raise IndexProblem(f"{lock}: is a link, which is not followed; delete it")
        # A pipe must not be waited for.
        flags = os.O_RDWR | os.O_CREAT | _NO_FOLLOW | getattr(os, "O_NONBLOCK", 0)
        file = os.open(lock, flags, 0o666)
    try:
        if not stat.S_ISREG(os.fstat(file).st_mode):
            raise IndexProblem(f"{lock}: is no file; delete it")
        if not _try_lock(file):
            waiting()
            _wait_for_lock(file)
        yield
    finally:
        os.close(file)


if sys.platform == "win32":
    import msvcrt
    import time

    def _try_lock(file: int) -> bool:
        try:
            msvcrt.locking(file, msvcrt.LK_NBLCK, 1)
        except OSError:
            return False
        return True

    def _wait_for_lock(file: int) -> None:
        while not _try_lock(file):
            time.sleep(0.05)

else:
    import fcntl

    def _try_lock(file: int) -> bool:
        try:
            fcntl.flock(file, fcntl.LOCK_EX | fcntl.LOCK_NB)
        except BlockingIOError:
            return False
        return True

    def _wait_for_lock(file: int) -> None:
        fcntl.flock(file, fcntl.LOCK_EX)
