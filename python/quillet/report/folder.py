"""The folder of a site, in which a new site takes the place of an older one all at once.

The new one is written to a folder inside, `.new`, and its entries change places with the old ones when it
is whole: a run that ends early, however it ends, leaves the site that was there. What else stands in the
folder (a host's settings, a repository) stays. A mark says that a folder is a report's, and is the lock by
which two runs keep out of each other's way. No link in the folder is followed.
"""

from __future__ import annotations

import os
import shutil
import stat
from collections.abc import Iterator
from contextlib import contextmanager
from pathlib import Path

# In the order in which they change places: the page that people open last.
ENTRIES = ("data", "files", "script.js", "style.css", "index.html")
_MARK = ".quillet-report"
_NEW = ".new"
_OLD = ".old"


class SiteProblem(Exception):
    """A folder that the site cannot be written to; the text says why."""


@contextmanager
def new_site(folder: str) -> Iterator[Path]:
    """A new folder to write `ENTRIES` to, which become the site at the end of a block that ends well.

    Raises `SiteProblem` and OSError.
    """
    target = Path(folder)
    was_there = os.path.lexists(target)
    if was_there and not target.is_dir():
        raise SiteProblem(f"{folder}: is no folder; name another one with -o")
    was_report = was_there and _is_file(target / _MARK)
    if was_there and not was_report and any(target.iterdir()):
        raise SiteProblem(f"{folder}: holds something else than a report; name another folder with -o")
    target.mkdir(parents=True, exist_ok=True)
    done = False
    try:
        with _locked(target / _MARK, folder):
            for name in (_NEW, _OLD):
                _remove(target / name)
            (target / _NEW).mkdir()
            try:
                yield target / _NEW
                _swap(target)
                done = True
            finally:
                _remove(target / _NEW)
                _remove(target / _OLD)
                if not done and not was_report:
                    _remove(target / _MARK)
    finally:
        if not done and not was_there:
            os.rmdir(target)


def _swap(target: Path) -> None:
    """Puts the new entries in the place of the old ones; all of them, or none."""
    new, old = target / _NEW, target / _OLD
    old.mkdir()
    try:
        for name in ENTRIES:
            if os.path.lexists(target / name):
                os.rename(target / name, old / name)
            os.rename(new / name, target / name)
    except BaseException:
        for name in ENTRIES:
            if os.path.lexists(old / name):
                _remove(target / name)
                os.rename(old / name, target / name)
        raise


@contextmanager
def _locked(mark: Path, folder: str) -> Iterator[None]:
    flags = os.O_RDWR | os.O_CREAT | getattr(os, "O_NOFOLLOW", 0) | getattr(os, "O_CLOEXEC", 0)
    descriptor = os.open(mark, flags, 0o666)
    try:
        if not _lock(descriptor):
            raise SiteProblem(f"{folder}: another run is writing a report there; wait for its end")
        if os.fstat(descriptor).st_size == 0:
            os.write(descriptor, b"This folder is written by quillet report.\n")
        yield
    finally:
        os.close(descriptor)


def _lock(descriptor: int) -> bool:
    """Locks a file until it is closed; false where another process has it."""
    try:
        import fcntl
    except ImportError:  # a system without such locks
        return True
    try:
        fcntl.flock(descriptor, fcntl.LOCK_EX | fcntl.LOCK_NB)
    except BlockingIOError:
        return False
    except OSError:  # a file system without locks
        return True
    return True


def _is_file(path: Path) -> bool:
    try:
        return stat.S_ISREG(os.lstat(path).st_mode)
    except OSError:
        return False


def _remove(path: Path) -> None:
    """Removes a file, a link or a folder, where there is one."""
    if path.is_dir() and not path.is_symlink():
        shutil.rmtree(path)
    else:
        path.unlink(missing_ok=True)
