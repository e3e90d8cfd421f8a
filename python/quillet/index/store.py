"""The file of an index: how it is found, read and written, and who may write it.

The file says which files hold which words; the core makes and reads its bytes, and docs/index.md
describes them. It is written beside itself and then put in its place, so whatever moment a run ends at,
the index is the old one or the new one, and who asks never waits. One run writes at a time, by a lock on
a file beside the index that the system drops with the process. The trap: an index may have come with a
repository that somebody else made. No link is followed where something is written, and what the file says
is only ever a hint where to look.
"""

from __future__ import annotations

import os
import stat
import sys
from collections.abc import Callable, Iterator
from contextlib import contextmanager, suppress
from typing import NamedTuple

from quillet.tarvex import _host

DEFAULT_NAME = ".quillet-index"
# The kinds of records in the order in which the core numbers them.
KINDS: tuple[str, ...] = _host.RECORD_KIND_WORDS
# What a record's name opens a scope for, if any.
CLASS = 1
FUNCTION = 2

# No index is as large; what is would be read for nothing.
_MOST_BYTES = 1 << 32
# An index was once a database that readers and a writer shared, by which it is told from an export.
_SQLITE = b"SQLite format 3\0"
_SQLITE_APPLICATION = b"QULT"
_SQLITE_SHARED = b"\2\2"


class IndexProblem(Exception):
    """An index that cannot be used; the text says why and what to do."""


class StaleIndex(IndexProblem):
    """An index that a run makes anew: damaged, or of another version."""


class Settings(NamedTuple):
    """What the last run was asked to do."""

    roots: tuple[str, ...]  # as the index keeps paths
    python: tuple[int, int]
    gitignore: bool
    made_by: str
    exclude: tuple[str, ...] = ()


class Stored(NamedTuple):
    """An index as it lies in its file."""

    native: _host.NameIndex
    settings: Settings


def find_index(start: str = ".") -> str:
    """The index of a folder or of the nearest one above it. Raises `IndexProblem` where there is none."""
    folder = os.path.abspath(start)
    while True:
        path = os.path.join(folder, DEFAULT_NAME)
        if os.path.isfile(path):
            return path
        parent = os.path.dirname(folder)
        if parent == folder:
            raise IndexProblem("there is no index here or above; make one with: quillet index .")
        folder = parent


def read_index(path: str) -> Stored:
    """Reads an index. Raises `IndexProblem`, and `StaleIndex` for one that a run makes anew."""
    if not os.path.isfile(path):
        raise IndexProblem(f"{path}: there is no such index; make it with: quillet index . -o {path}")
    with explained(path), open(path, "rb") as file:
        head = file.read(72)
        state = _host.NameIndex.StateOf(head)
        if head.startswith(_SQLITE) and (head[18:20], head[68:72]) == (_SQLITE_SHARED, _SQLITE_APPLICATION):
            state = "other schema"
        if state == "foreign" or os.fstat(file.fileno()).st_size > _MOST_BYTES:
            raise IndexProblem(f"{path}: is no index of quillet; name another file with -o, or delete this one")
        if state != "other schema":
            data = head + file.read()
            state = _host.NameIndex.StateOf(data)
    if state == "other schema":
        raise StaleIndex(f"{path}: was made by another version of quillet; make it anew with: quillet index")
    try:
        native = _host.NameIndex(data)
        return Stored(native, _settings_of(native.settings))
    except ValueError as error:
        raise StaleIndex(f"{path}: the index is damaged; make it anew with: quillet index") from error


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
        raise IndexProblem(f"{path}: there is no folder {folder} to hold the index")
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
    """What tells one build of the engine from another, whose words of a file may be others."""
    from quillet import tarvex

    status = os.stat(tarvex.__file__ or sys.executable)
    return f"{status.st_size}-{status.st_mtime_ns}"


@contextmanager
def explained(path: str) -> Iterator[None]:
    """Turns what the system says of a bad file into an `IndexProblem`."""
    try:
        yield
    except OSError as error:
        raise IndexProblem(f"{path}: {error.strerror or error}") from error


def settings_text(settings: Settings) -> bytes:
    """Settings as an index keeps them. No path holds a NUL."""
    version = "{}.{}".format(*settings.python)
    parts = (version, str(int(settings.gitignore)), settings.made_by, "\n".join(settings.exclude), *settings.roots)
    return "\0".join(parts).encode("utf-8", "surrogateescape")


def _settings_of(text: bytes) -> Settings:
    version, gitignore, made_by, exclude, *roots = text.decode("utf-8", "surrogateescape").split("\0")
    major, _, minor = version.partition(".")
    python = int(major), int(minor)
    if python != (2, 7) and not (python[0] == 3 and 0 <= python[1] < 100):
        raise ValueError("a version that there is not")
    patterns = tuple(exclude.split("\n")) if exclude else ()
    return Settings(tuple(roots), python, gitignore == "1", made_by, patterns)


# ---- the lock ----

_NO_FOLLOW = getattr(os, "O_NOFOLLOW", 0) | getattr(os, "O_BINARY", 0) | getattr(os, "O_CLOEXEC", 0)


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
