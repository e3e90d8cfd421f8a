"""Questions about programs: where something is defined, who uses it, what it is, and what can follow the dot.

A workspace reads the files that a question needs, and again those that changed. Nothing is imported or run: where
the libraries of an environment lie is found by its folders, and what the standard library is by the stubs of the
package typeshed-client. Lines and columns count from 1, columns in UTF-8 bytes, as those of `bind`, unless a workspace
is asked to count otherwise.
"""

from __future__ import annotations

import os
import sys

from quillet._languages import language_version, native_language_of
from quillet.tarvex import _host

# As typing has it, which takes longer to load than a question to answer.
TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterable, Sequence
    from typing import Literal, NamedTuple

    StrPath = str | bytes | os.PathLike[str] | os.PathLike[bytes]
    Columns = Literal["utf-8", "utf-16", "utf-32"]
    Certainty = Literal["certain", "likely", "by name"]
else:
    from quillet._named import NamedTuple

_COLUMNS: tuple[Columns, ...] = ("utf-8", "utf-16", "utf-32")
_CERTAINTIES: tuple[Certainty, ...] = ("certain", "likely", "by name")


class Location(NamedTuple):
    """A place where a name stands. `path` is absolute.

    `role` and `kind` are those of `Occurrence`, and "module" for a file as a whole. `certainty` is "certain" where
    the language or types decide it, "likely" where it was inferred, and "by name" where nothing but the name speaks
    for it.
    """

    path: str
    line: int
    column: int
    end_column: int
    role: str | None
    kind: str | None
    certainty: Certainty


class Call(NamedTuple):
    """A function that calls another one, or is called: the place of its name as in `Location`, its qualified name, and
    where it does so.
    """

    path: str
    line: int
    column: int
    end_column: int
    role: str | None
    kind: str | None
    certainty: Certainty
    name: str
    calls: tuple[Location, ...]


class Completion(NamedTuple):
    """What may be written at a place. `detail` is a type or a signature."""

    name: str
    kind: str
    detail: str
    documentation: str
    certainty: Certainty


class Edit(NamedTuple):
    """A text in place of what stands from `column` up to `end_column`, which is on the same line unless `end_line`
    says otherwise.
    """

    path: str
    line: int
    column: int
    end_column: int
    text: str
    end_line: int | None = None


class Hover(NamedTuple):
    """What is at a place: its declaration as one writes it, its documentation and its types, and where the name is."""

    text: str
    documentation: str
    types: tuple[str, ...]
    certainty: Certainty
    line: int
    column: int
    end_column: int


class Parameter(NamedTuple):
    """A parameter of a signature: as it is shown, such as `tax: float = 0`, and its name."""

    label: str
    name: str


class Signature(NamedTuple):
    """How what is called at a place may be called. `active` is the index of the parameter at the place, None without
    one.
    """

    label: str
    documentation: str
    parameters: tuple[Parameter, ...]
    active: int | None
    certainty: Certainty


class WorkspaceSymbol(NamedTuple):
    """A class, function, method or variable of a project. `container` is the dotted name of what is around it."""

    name: str
    kind: str
    container: str
    path: str
    line: int
    column: int
    end_column: int


class OutlineItem(NamedTuple):
    """A class, function, method, variable or attribute of a file, with what is in it.

    `line`, `column` and `end_column` are those of the name, the others those of the whole.
    """

    name: str
    kind: str
    detail: str
    line: int
    column: int
    end_column: int
    first_line: int
    last_line: int
    first_column: int
    last_column: int
    children: tuple[OutlineItem, ...]


class Problem(NamedTuple):
    """What is wrong at a place. `code` is "syntax", "unresolved-import" or "unbound-name"."""

    line: int
    column: int
    end_line: int
    end_column: int
    code: str
    message: str


class Stopped(Exception):
    """A question was ended by `Workspace.stop`."""


class Fold(NamedTuple):
    """Lines that an editor may show as one, the last one included. `kind` is "comment", "imports", "region" or ""."""

    first_line: int
    last_line: int
    kind: str


class Hint(NamedTuple):
    """What an editor may show within a line: `kind` is "type", behind what has it, or "parameter", in front of an
    argument.
    """

    line: int
    column: int
    text: str
    kind: str
    certainty: Certainty


class RenameError(ValueError):
    """A name cannot be changed; the message says why not."""


class Workspace:
    """The programs below some folders, for questions about them.

    `roots` are project folders, the working folder without any; a `src` folder in them is one of sources, and what
    .gitignore files exclude does not belong to them, nor what `exclude` does, lines of such a file for each root.
    `environment` is a virtual environment, an interpreter or the
    folder of an installation; without it the active one (VIRTUAL_ENV), or `.venv` in the first root, or that of the
    running interpreter is taken. `version` is the Python that the sources are written for, without it the
    environment's.

    `columns` says what columns count: bytes of UTF-8, units of UTF-16, or code points ("utf-32").

    Any thread may ask; they are answered one after the other. Raises `OSError` for a root that is not there,
    `ValueError` for an environment that is none and for a version that is unknown.
    """

    def __init__(
        self,
        *roots: StrPath,
        exclude: Iterable[str] = (),
        environment: StrPath | None = None,
        version: tuple[int, ...] | None = None,
        columns: Columns = "utf-8",
    ) -> None:
        folders = [os.path.abspath(os.fsencode(root)) for root in roots or (".",)]
        for folder in folders:
            os.stat(folder)
        libraries, found = _environment(folders, environment)
        if version is not None:
            found_version = language_version(version)
            # The libraries of the other Python are no help.
            if environment is None and found is not None and found[0] != found_version[0]:
                libraries = []
        else:
            found_version = found if found is not None and _is_known(found) else language_version()
        self._version = found_version
        self._roots = tuple(os.fsdecode(folder) for folder in folders)
        self._last_path = "", b""  # an absolute one that was given, and as the core has it
        self._native = _host.Workspace(
            folders,
            [os.fsencode(library) for library in libraries],
            _typeshed(),
            (*found_version, 0),
            _utf8("\n".join(exclude)),
            _index_maker(folders),
            native_language_of(found_version),
        )
        if columns not in _COLUMNS:
            raise ValueError(f"columns must be one of {', '.join(map(repr, _COLUMNS))}, not {columns!r}")
        if columns != "utf-8":
            self._native.SetColumnUnit(columns.encode())

    @property
    def roots(self) -> tuple[str, ...]:
        return self._roots

    @property
    def version(self) -> tuple[int, int]:
        """The Python that the sources are taken to be written for."""
        return self._version

    @property
    def was_bounded(self) -> bool:
        """Whether the last answer met a bound of its work, so that there may be more than it says."""
        return self._native.was_bounded

    # ---- places ----

    def definitions(self, path: StrPath, line: int, column: int, *, at_least: Certainty = "by name") -> list[Location]:
        """Where the name at a place is defined, the surest first, of at least the certainty that is asked for."""
        return _locations(self._native.Definitions(self._readable(path), line, column), at_least)

    def type_definitions(self, path: StrPath, line: int, column: int) -> list[Location]:
        """Where the types of what is at a place are defined."""
        return _locations(self._native.TypeDefinitions(self._readable(path), line, column))

    def declarations(self, path: StrPath, line: int, column: int) -> list[Location]:
        """Where what is at a place is declared: by a stub, where there is one, and otherwise where it is defined."""
        return _locations(self._native.Declarations(self._readable(path), line, column))

    def implementations(self, path: StrPath, line: int, column: int) -> list[Location]:
        """All classes below the one that is named at a place, or what overrides its method; otherwise definitions."""
        return _locations(self._native.Implementations(self._readable(path), line, column))

    def references(
        self,
        path: StrPath,
        line: int,
        column: int,
        *,
        at_least: Certainty = "by name",
        everywhere: bool = True,
    ) -> list[Location]:
        """All places of the project that name what is named at a place, its definitions among them, in the order of
        files and lines; without `everywhere` those of the same file.
        """
        return _locations(self._native.References(self._readable(path), line, column, everywhere), at_least)

    def types(self, path: StrPath, line: int, column: int) -> list[str]:
        """What the expression at a place may be, such as `builtins.int`, `type[shop.Basket]` or
        `def (x: int) -> str`.
        """
        return self._native.Types(self._readable(path), line, column)

    def hover(self, path: StrPath, line: int, column: int) -> Hover | None:
        """What is at a place, as one would want to read it; None where nothing is."""
        row = self._native.Hover(self._readable(path), line, column)
        return None if row is None else Hover._make(row)

    def signatures(self, path: StrPath, line: int, column: int) -> list[Signature]:
        """How what is called around a place may be called."""
        return [
            Signature(label, documentation, tuple(map(Parameter._make, parameters)), active, certainty)
            for label, documentation, parameters, active, certainty in self._native.Signatures(
                self._readable(path), line, column
            )
        ]

    def complete(self, path: StrPath, line: int, column: int) -> list[Completion]:
        """What may be written at a place, the best first."""
        return [Completion._make(row) for row in self._native.Complete(self._readable(path), line, column)]

    def describe_completion(self, path: StrPath, line: int, column: int, name: str) -> Hover | None:
        """What one of the names is that may be written at a place, as `hover` says it; None where it is not known."""
        row = self._native.DescribeCompletion(self._readable(path), line, column, _utf8(name))
        return None if row is None else Hover._make(row)

    def rename(self, path: StrPath, line: int, column: int, new_name: str, *, only_certain: bool = True) -> list[Edit]:
        """The edits in all files that give what is named at a place another name, in the order of files and lines.

        Raises `RenameError` where that cannot be done: the name is no identifier, is taken, stands in no file of the
        project, or (with `only_certain`) where a place may or may not be one of its.
        """
        rows, problem = self._native.Rename(self._readable(path), line, column, _utf8(new_name), only_certain)
        if rows is None:
            raise RenameError(problem)
        return [Edit(*row) for row in rows]

    def callers(self, path: StrPath, line: int, column: int) -> list[Call]:
        """The functions that call the one that is named at a place."""
        return _calls(self._native.Callers(self._readable(path), line, column))

    def callees(self, path: StrPath, line: int, column: int) -> list[Call]:
        """The functions that the one that is named at a place calls."""
        return _calls(self._native.Callees(self._readable(path), line, column))

    def supertypes(self, path: StrPath, line: int, column: int) -> list[Location]:
        """The bases of the class that is named at a place, or the methods that its method overrides."""
        return _locations(self._native.Supertypes(self._readable(path), line, column))

    def subtypes(self, path: StrPath, line: int, column: int) -> list[Location]:
        """The classes that derive from the one that is named at a place, or the methods that override its method."""
        return _locations(self._native.Subtypes(self._readable(path), line, column))

    # ---- files and projects ----

    def named(self, dotted_name: str) -> list[Location]:
        """What the project defines by a dotted name, such as `Shop.total` or `shop.Shop.total`."""
        return _locations(self._native.Named(_utf8(dotted_name)))

    def symbols(self, query: str, *, limit: int = 200) -> list[WorkspaceSymbol]:
        """What the project defines whose name is like `query`: the exact ones first, then those that begin with it,
        then those that have its letters; classes and functions before variables.
        """
        return [WorkspaceSymbol._make(row) for row in self._native.Symbols(_utf8(query), limit)]

    def outline(self, path: StrPath) -> list[OutlineItem]:
        """The classes, functions and variables of a file as a tree."""
        rows = self._native.Outline(self._readable(path))
        children: list[list[OutlineItem]] = [[] for _ in rows]
        top: list[OutlineItem] = []
        for place in range(len(rows) - 1, -1, -1):
            parent, *fields = rows[place]
            item = OutlineItem._make((*fields, tuple(reversed(children[place]))))
            (top if parent is None else children[parent]).append(item)
        return top[::-1]

    def problems(self, path: StrPath) -> list[Problem]:
        """What is wrong in a file: its syntax errors, imports that lead nowhere, and names that are nothing."""
        return [Problem._make(row) for row in self._native.Problems(self._readable(path))]

    def folds(self, path: StrPath) -> list[Fold]:
        """What of a file may be shown as one line, at most one for each line that it begins on."""
        return [Fold._make(row) for row in self._native.Folds(self._readable(path))]

    def selections(self, path: StrPath, line: int, column: int) -> list[tuple[int, int, int, int]]:
        """What holds a place, as line, column, end line and end column: the smallest first, the file last."""
        return self._native.Selections(self._readable(path), line, column)

    def tokens(self, path: StrPath, first_line: int = 0, last_line: int = 0) -> list[int]:
        """What the names of a file are, or of some of its lines: five numbers each, the lines and columns since the
        name in front, its length, its kind (namespace, class, enum, type parameter, function, method, property,
        variable, parameter, member of an enum, decorator) and the bits of its modifiers (declaration, read-only,
        static, asynchronous, modification, documentation, of the standard library).
        """
        return self._native.Colours(self._readable(path), first_line, last_line)

    def hints(self, path: StrPath, first_line: int = 0, last_line: int = 0) -> list[Hint]:
        """Types that are not written, and parameters of arguments, of a file or of some of its lines."""
        return [Hint._make(row) for row in self._native.Hints(self._readable(path), first_line, last_line)]

    def source(self, path: StrPath) -> bytes:
        """The text of a file or buffer, in UTF-8."""
        return self._native.SourceOf(self._readable(path))

    # ---- buffers ----

    def open(self, path: StrPath, text: str | bytes) -> None:
        """An editor's text in place of a file's, which need not exist."""
        if not isinstance(text, str):
            from quillet._source import to_utf8

            self._native.Open(self._path(path), to_utf8(text))
        else:
            self._native.Open(self._path(path), text.encode("utf-8", "surrogatepass"))

    def change(self, path: StrPath, edits: Iterable[Sequence[object]]) -> None:
        """Changes a text, of which a buffer is made where none is open. The edits, `Edit` or tuples of that form, are
        made one after the other, each in what the one before left; their paths are not looked at.
        """
        file = self._path(path)
        for given in edits:
            edit = Edit(*given)  # type: ignore[arg-type]
            end_line = edit.line if edit.end_line is None else edit.end_line
            begin, end = (edit.line, edit.column), (end_line, edit.end_column)
            self._native.Change(file, begin, end, _utf8(edit.text))

    def close(self, path: StrPath) -> None:
        """The file counts again, and not the buffer."""
        self._native.Close(self._path(path))

    def refresh(self) -> None:
        """Looks at once which files changed. Questions do so themselves, unless they did a moment ago."""
        self._native.Refresh()

    def stop(self, *, patience: float = 0) -> None:
        """Ends what another thread asks, and what is asked behind it, by `Stopped`, until `proceed` says otherwise; not
        before `patience` seconds have passed since it last did.
        """
        self._native.Stop(patience)

    def proceed(self) -> None:
        """Questions are answered again."""
        self._native.Proceed()

    def source_line(self, path: StrPath, line: int) -> bytes:
        """A line of a file, in UTF-8 and without its end."""
        return self._native.LineOf(self._path(path), line)

    def __repr__(self) -> str:
        roots = ", ".join(map(repr, self._roots))
        return f"<Workspace {roots} for Python {self._version[0]}.{self._version[1]}>"

    def _path(self, path: StrPath) -> bytes:
        last, file = self._last_path  # questions come one after the other about the same file
        if type(path) is str and path == last:
            return file
        file = os.path.abspath(os.fsencode(path))
        if type(path) is str and os.path.isabs(path):
            self._last_path = path, file
        return file

    def _readable(self, path: StrPath) -> bytes:
        """The path of a file that can be read. Raises `OSError` for any other."""
        file = self._path(path)
        if not self._native.CanRead(file):
            with open(file, "rb", opener=_open_at_once):
                pass
            raise OSError(f"{os.fsdecode(file)}: cannot be read as source")
        return file


def _open_at_once(path: str, flags: int) -> int:
    """Opens a pipe without waiting for who writes to it."""
    return os.open(path, flags | getattr(os, "O_NONBLOCK", 0))


def _utf8(text: str) -> bytes:
    return text.encode("utf-8", "surrogateescape")


def _locations(rows: Iterable[tuple[object, ...]], at_least: Certainty = "by name") -> list[Location]:
    if at_least not in _CERTAINTIES:
        raise ValueError(f"at_least must be one of {', '.join(map(repr, _CERTAINTIES))}, not {at_least!r}")
    wanted = _CERTAINTIES[: _CERTAINTIES.index(at_least) + 1]
    return [Location._make(row) for row in rows if row[-1] in wanted]


def _calls(rows: Iterable[tuple[tuple[object, ...], str, list[tuple[object, ...]]]]) -> list[Call]:
    return [Call._make((*place, name, tuple(_locations(calls)))) for place, name, calls in rows]


# ---- environments ----


def _environment(roots: Sequence[bytes], given: StrPath | None) -> tuple[list[str], tuple[int, int] | None]:
    """The folders of libraries and the version of the environment that is given or that is in use."""
    if given is not None:
        path = os.fsencode(given)
        os.stat(path)
        libraries, version = _host.find_environment(path)
        if not libraries:
            raise ValueError(f"{os.fsdecode(path)}: is no environment of Python")
        return libraries, version
    active = os.environ.get("VIRTUAL_ENV")
    beside = os.path.join(os.fsdecode(roots[0]), ".venv")
    for candidate in (*([active] if active else []), beside, sys.prefix):
        libraries, version = _host.find_environment(os.fsencode(candidate))
        if libraries:
            return libraries, version
    return [], None


def _is_known(version: tuple[int, int]) -> bool:
    return version == (2, 7) or version[0] == 3


def _index_maker(folders: list[bytes]) -> bytes:
    """What makes the indexes that are used, where one lies in any of the folders: this very build of the engine, as
    another one may tell other words of a file.
    """
    if not any(os.path.isfile(os.path.join(folder, b".quillet-index")) for folder in folders):
        return b""
    from quillet.index.writing import engine_mark

    return engine_mark().encode()


def _typeshed() -> bytes:
    """The folder of the standard library's stubs, empty where the package that has them is not installed."""
    for entry in sys.path:  # as the import system does, whose way takes longer to load than a question to answer
        folder = os.path.join(entry, "typeshed_client", "typeshed")
        if os.path.isdir(folder):
            return os.fsencode(folder)
    from importlib.util import find_spec

    spec = find_spec("typeshed_client")
    if spec is None or not spec.submodule_search_locations:
        return b""
    return os.path.join(os.fsencode(spec.submodule_search_locations[0]), b"typeshed")
