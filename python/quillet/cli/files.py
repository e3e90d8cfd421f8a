"""Which files a command reads: the arguments, with each folder walked in sorted order.

A folder gives its .py, .pyi and .pyw files and those whose first line names Python as interpreter.
.gitignore files count where git would read them: in the folder, in those below it and in those above
it up to the root of the repository; the one nearest to a file decides. An argument is read whatever
excludes it. The repository's own folder .git is never entered.
The trap: a folder may hold anything. Only regular files are opened. A link to a folder is not followed, a
link to a file counts where the file lies below an argument and was not met by its own name, and one that
leads nowhere that can be told is named, as is whatever else cannot be looked at.
"""

from __future__ import annotations

import errno
import os
import re
import stat
from collections.abc import Iterable, Iterator, Sequence
from contextlib import suppress
from typing import TYPE_CHECKING

if TYPE_CHECKING:
    from quillet.tarvex import _host

_SUFFIXES = (".py", ".pyi", ".pyw")
_SHEBANG = re.compile(rb"#!.*\bpython[0-9.]*\b")
# What is never anybody's source: left out below a folder, as if a rule behind all others said so.
_LEFT_OUT = b".venv/\nnode_modules/\n__pycache__/\n"
_PIECE = 1 << 20
_DANGLING = (errno.ENOENT, errno.ENOTDIR)


class Found:
    """A path to read, or one that cannot be, with the reason in `problem`."""

    __slots__ = ("path", "problem")

    def __init__(self, path: str, problem: str | None = None) -> None:
        self.path = path
        self.problem = problem


def find_files(paths: Sequence[str], *, gitignore: bool, exclude: Iterable[str] = ()) -> Iterator[Found]:
    """The files of the arguments, in their order; links to files come last. "-" passes as it is.

    `exclude` are patterns as in a .gitignore file of each folder that is an argument; they overrule those
    files.
    """
    return _Walk(paths, gitignore, exclude).files()


class Exclusion:
    """Which files patterns leave out of a folder that is not walked. `excludes` takes a path from the folder on, with
    slashes.
    """

    def __init__(self, patterns: Iterable[str]) -> None:
        from quillet.tarvex import _host

        self._rules = _host.IgnoreRules(_lines_of(patterns))
        self._folders: dict[bytes, bool] = {}

    def excludes(self, path: bytes) -> bool:
        """Whether a file is left out, itself or with a folder around it."""
        folder = path.rpartition(b"/")[0]
        known = self._folders.get(folder)
        if known is None:
            ends = (match.start() for match in re.finditer(rb"/", path))
            known = self._folders[folder] = any(self._rules.Verdict(path[:end], True) for end in ends)
        return known or self._rules.Verdict(path, False) is True


def _lines_of(patterns: Iterable[str]) -> bytes:
    """Patterns as the text of a .gitignore file; one is never a comment."""
    lines = [f"\\{pattern}" if pattern.startswith("#") else pattern for pattern in patterns]
    return b"\n".join(map(os.fsencode, lines))


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
        descriptor = os.open(file, os.O_RDONLY | _flags("O_NONBLOCK", "O_NOCTTY", "O_CLOEXEC"))
    except OSError:
        return False
    try:
        return os.isatty(descriptor)
    finally:
        os.close(descriptor)


# ---- rules ----


class _Rules:
    """The rules of one folder, in front of those that they overrule."""

    def __init__(self, outer: _Rules | None, folder: bytes, native: _host.IgnoreRules) -> None:
        self._outer = outer
        self._start = len(folder.rstrip(b"/")) + 1
        self._native = native

    def verdict(self, path: bytes, is_folder: bool) -> bool | None:
        """Whether a path is excluded, None where no rule matches."""
        rules: _Rules | None = self
        while rules is not None:
            verdict = rules._native.Verdict(path[rules._start :], is_folder)
            if verdict is not None:
                return verdict
            rules = rules._outer
        return None


def _rules_of(outer: _Rules | None, folder: bytes, text: bytes) -> _Rules:
    from quillet.tarvex import _host

    return _Rules(outer, folder, _host.IgnoreRules(text))


def _read_rules(outer: _Rules, folder: bytes, path: bytes, *, follow: bool = False) -> _Rules:
    """The rules of a file, in front of `outer`. Raises OSError for one that is there and cannot be read."""
    text = _read_small(path, follow=follow)
    return outer if text is None else _rules_of(outer, folder, text)


def _read_small(path: bytes, *, follow: bool) -> bytes | None:
    """The content of a regular file, None where there is none. As for git, a .gitignore is no link."""
    try:
        flags = _flags("O_NONBLOCK", "O_CLOEXEC") | (0 if follow else _flags("O_NOFOLLOW"))
        descriptor = os.open(path, os.O_RDONLY | flags)
    except OSError as error:
        if error.errno in (*_DANGLING, errno.ELOOP, errno.ENXIO, errno.EISDIR):
            return None
        raise
    with open(descriptor, "rb") as file:
        return file.read() if stat.S_ISREG(os.fstat(descriptor).st_mode) else None


def _flags(*names: str) -> int:
    """Flags of os.open, as far as the system has them."""
    flags = 0
    for name in names:
        flags |= getattr(os, name, 0)
    return flags


def _read_exclude(outer: _Rules, root: bytes) -> _Rules:
    """The rules of a repository that are in no folder of it."""
    folder = root + b"/.git"
    try:
        if not os.path.isdir(folder):  # a worktree or a submodule: a file names the folder
            text = _read_small(folder, follow=True) or b""
            folder = os.path.join(root, text.removeprefix(b"gitdir:").strip())
            common = _read_small(folder + b"/commondir", follow=True) or b"."
            folder = os.path.join(folder, common.strip())
        return _read_rules(outer, root, folder + b"/info/exclude", follow=True)
    except (OSError, ValueError):
        return outer


def _rules_above(outer: _Rules, folder: bytes) -> _Rules:
    """The rules that hold in `folder` from outside it: those of its repository, in front of `outer`.

    A folder that is named is wanted: where they exclude it, they do not count.
    """
    chain = [folder]
    while not os.path.lexists(chain[-1] + b"/.git"):
        parent = os.path.dirname(chain[-1])
        if parent == chain[-1]:
            return outer  # in no repository: only the folder's own files count
        chain.append(parent)
    rules = _read_exclude(outer, chain.pop())
    for below in reversed(chain):
        above = os.path.dirname(below)
        # Who may not read a file of rules outside of what was named is no worse off than without it.
        with suppress(OSError):
            rules = _read_rules(rules, above, above.rstrip(b"/") + b"/.gitignore")
        if rules.verdict(below, True):
            return outer
    return rules


# ---- folders ----


class _Walk:
    def __init__(self, paths: Sequence[str], gitignore: bool, exclude: Iterable[str]) -> None:
        self._paths = paths
        self._gitignore = gitignore
        self._exclude = _lines_of(exclude)
        self._roots: list[bytes] = []
        self._met: set[bytes] = set()
        self._links: list[tuple[str, bytes]] = []

    def files(self) -> Iterator[Found]:
        self._roots = [_real(path) for path in self._paths if path != "-"]
        for path in self._paths:
            if path == "-":
                yield Found(path)
            elif os.path.isdir(path):
                yield from self._folder(path)
            else:
                self._met.add(_real(path))
                yield Found(path, device_problem(path))
        for path, target in self._links:
            if target not in self._met:
                self._met.add(target)
                yield Found(path)

    def _folder(self, top: str) -> Iterator[Found]:
        # Names are shown as they were given; rules are asked with real paths, since those of the
        # repository may stand above the folder that was named.
        real_top = _real(top)
        base = _rules_of(None, real_top, _LEFT_OUT)
        own = _rules_of(None, real_top, self._exclude) if self._exclude else None
        above = _rules_above(base, real_top) if self._gitignore else base
        pending = [(top, real_top, above)]
        while pending:
            folder, real_folder, rules = pending.pop()
            try:
                with os.scandir(folder) as entries:
                    found = sorted(entries, key=lambda entry: entry.name)
            except OSError as error:
                yield Found(folder, problem_of(error))
                continue
            if self._gitignore:
                names = {entry.name for entry in found}
                if ".git" in names and real_folder != real_top:
                    rules = _read_exclude(base, real_folder)  # a repository within: its own rules
                if ".gitignore" in names:
                    try:
                        rules = _read_rules(rules, real_folder, real_folder + b"/.gitignore")
                    except OSError as error:
                        yield Found(os.path.join(folder, ".gitignore"), problem_of(error))
            folders = []
            for entry in found:
                try:
                    is_folder = entry.is_dir(follow_symlinks=False)
                    name = entry.name
                    if name == ".git" or not (is_folder or name.endswith(_SUFFIXES) or "." not in name):
                        continue
                    real_path = real_folder.rstrip(b"/") + b"/" + os.fsencode(name)
                    verdict = own.verdict(real_path, is_folder) if own is not None else None
                    if verdict or (verdict is None and rules.verdict(real_path, is_folder)):
                        continue
                    if is_folder:
                        folders.append((entry.path, real_path, rules))
                    elif self._is_wanted(entry, real_path):
                        yield Found(entry.path)
                except OSError as error:
                    yield Found(entry.path, problem_of(error))
            pending.extend(reversed(folders))

    def _is_wanted(self, entry: os.DirEntry[str], real_path: bytes) -> bool:
        """Whether a file is to be read at this place. Raises OSError for one that cannot be told."""
        is_link = entry.is_symlink()
        if not is_link and not entry.is_file(follow_symlinks=False):
            return False
        if is_link:
            try:
                status = os.stat(entry.path)
            except OSError as error:
                # A link to nothing: a reader should hear of it where its name says that it is Python.
                if error.errno in _DANGLING and not entry.name.endswith(_SUFFIXES):
                    return False
                raise
            if not stat.S_ISREG(status.st_mode):
                return False
        if not entry.name.endswith(_SUFFIXES) and not _names_python(entry.path):
            return False
        if not is_link:
            self._met.add(real_path)
            return True
        target = _real(entry.path)
        if any(_is_below(target, root) for root in self._roots):
            self._links.append((entry.path, target))
        return False


def _real(path: str) -> bytes:
    """Where a path really leads, with slashes on every system."""
    with suppress(OSError, ValueError):  # such as for a NUL in the name
        path = os.path.realpath(path)
    return os.fsencode(path.replace(os.sep, "/"))


def _is_below(path: bytes, folder: bytes) -> bool:
    return path == folder or path.startswith(folder.rstrip(b"/") + b"/")


def _names_python(path: str) -> bool:
    """Whether the first line of a file names Python as its interpreter."""
    try:
        descriptor = os.open(path, os.O_RDONLY | _flags("O_NONBLOCK", "O_CLOEXEC"))
    except OSError:
        return False
    with open(descriptor, "rb") as file:
        return stat.S_ISREG(os.fstat(descriptor).st_mode) and _SHEBANG.match(file.readline(256)) is not None
