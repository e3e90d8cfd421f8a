"""Which files a command reads: the arguments, with each folder walked in sorted order.

A folder gives its .py, .pyi and .pyw files and those whose first line names Python as interpreter.
.gitignore files count where git would read them: in the folder, in those below it and in those above
it up to the root of the repository; the one nearest to a file decides. An argument is read whatever
excludes it. The repository's own folder .git is never entered, a link to a folder never followed.
"""

from __future__ import annotations

import os
import re
from collections.abc import Iterator
from typing import TYPE_CHECKING

if TYPE_CHECKING:
    from pathspec import GitIgnoreSpec

_SUFFIXES = (".py", ".pyi", ".pyw")
_SHEBANG = re.compile(rb"#!.*\bpython[0-9.]*\b")


class Found:
    """A path to read, or one that cannot be, with the reason in `problem`."""

    __slots__ = ("path", "problem")

    def __init__(self, path: str, problem: str | None = None) -> None:
        self.path = path
        self.problem = problem


def find_files(paths: tuple[str, ...], *, gitignore: bool) -> Iterator[Found]:
    """The files of the arguments, in their order. "-" passes as it is."""
    for path in paths:
        if path != "-" and os.path.isdir(path):
            yield from _walk(path, gitignore)
        else:
            yield Found(path)


def read_file(path: str) -> bytes:
    """The bytes of a file. Raises OSError."""
    with open(path, "rb") as file:
        return file.read()


def problem_of(error: OSError) -> str:
    """The reason of a failure to read, as one phrase."""
    return error.strerror or str(error)


class _Ignore:
    """The rules of one folder's .gitignore, behind those of the folders above it."""

    def __init__(self, outer: _Ignore | None, folder: str, spec: GitIgnoreSpec) -> None:
        self._outer = outer
        self._folder = folder
        self._spec = spec

    def excludes(self, path: str, is_folder: bool) -> bool:
        rules: _Ignore | None = self
        while rules is not None:
            relative = os.path.relpath(path, rules._folder).replace(os.sep, "/")
            verdict = rules._spec.check_file(relative + "/" if is_folder else relative).include
            if verdict is not None:
                return verdict
            rules = rules._outer
        return False


def _read_ignore(outer: _Ignore | None, folder: str, name: str = ".gitignore") -> _Ignore | None:
    try:
        with open(os.path.join(folder, name), encoding="utf-8", errors="surrogateescape") as file:
            lines = file.read().splitlines()
    except OSError:
        return outer
    from pathspec import GitIgnoreSpec

    return _Ignore(outer, folder, GitIgnoreSpec.from_lines(lines))


def _ignore_above(folder: str) -> _Ignore | None:
    """The rules that hold in `folder` from outside it: those of its repository."""
    chain = []
    at = folder
    while not os.path.exists(os.path.join(at, ".git")):
        parent = os.path.dirname(at)
        if parent == at:
            return None  # in no repository: only the folder's own files count
        at = parent
        chain.append(at)
    root = chain[-1] if chain else at
    rules = _read_ignore(None, root, os.path.join(".git", "info", "exclude"))
    for above in reversed(chain):
        rules = _read_ignore(rules, above)
    return rules


def _walk(top: str, gitignore: bool) -> Iterator[Found]:
    # Names are shown as they were given; rules are asked with real paths, since those of the
    # repository may stand above the folder that was named.
    real_top = os.path.realpath(top)
    above = _ignore_above(real_top) if gitignore else None
    if above is not None and above.excludes(real_top, is_folder=True):
        above = None  # a folder that is named is wanted, whatever excludes it
    pending = [(top, real_top, above)]
    while pending:
        folder, real_folder, outer = pending.pop()
        try:
            with os.scandir(folder) as entries:
                found = sorted(entries, key=lambda entry: entry.name)
        except OSError as error:
            yield Found(folder, problem_of(error))
            continue
        rules = outer
        if gitignore and any(entry.name == ".gitignore" for entry in found):
            rules = _read_ignore(outer, real_folder)
        folders = []
        for entry in found:
            is_folder = entry.is_dir(follow_symlinks=False)
            if is_folder and entry.name == ".git":
                continue
            real_path = os.path.join(real_folder, entry.name)
            if rules is not None and rules.excludes(real_path, is_folder):
                continue
            if is_folder:
                folders.append((entry.path, real_path, rules))
            elif _is_python(entry):
                yield Found(entry.path)
        pending.extend(reversed(folders))


def _is_python(entry: os.DirEntry[str]) -> bool:
    if not entry.is_file():
        # A link to nothing: a reader should hear of it where its name says that it is Python. Anything
        # else (a pipe, a device) is no file of a folder's source.
        return entry.is_symlink() and not os.path.exists(entry.path) and entry.name.endswith(_SUFFIXES)
    if entry.name.endswith(_SUFFIXES):
        return True
    if "." in entry.name:
        return False
    try:
        with open(entry.path, "rb") as file:
            return _SHEBANG.match(file.readline(256)) is not None
    except OSError:
        return False
