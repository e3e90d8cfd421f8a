"""The file of an index: how it is found and read.

The file says which files hold which words; the core makes and reads its bytes, and docs/index.md
describes them. What it says is only ever a hint where to look, since it may have come with a repository that
somebody else made.

Little is loaded here, since a question that one types has to be answered before one notices.
"""

from __future__ import annotations

import os

from quillet.tarvex import _host

TYPE_CHECKING = False
if TYPE_CHECKING:
    from types import TracebackType

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


class Settings:
    """What the last run was asked to do. `roots` are as the index keeps paths."""

    def __init__(
        self,
        roots: tuple[str, ...],
        python: tuple[int, int],
        gitignore: bool,
        made_by: str,
        exclude: tuple[str, ...] = (),
    ) -> None:
        self.roots = roots
        self.python = python
        self.gitignore = gitignore
        self.made_by = made_by
        self.exclude = exclude


class Stored:
    """An index as it lies in its file."""

    def __init__(self, native: _host.NameIndex, settings: Settings) -> None:
        self.native = native
        self.settings = settings


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


class explained:
    """Turns what the system says of a bad file into an `IndexProblem`."""

    def __init__(self, path: str) -> None:
        self._path = path

    def __enter__(self) -> None:
        pass

    def __exit__(
        self, kind: type[BaseException] | None, error: BaseException | None, traceback: TracebackType | None
    ) -> None:
        if isinstance(error, OSError):
            raise IndexProblem(f"{self._path}: {error.strerror or error}") from error


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
