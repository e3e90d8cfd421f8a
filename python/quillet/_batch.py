"""Many files at once: paths in, records out, on all cores and without the interpreter lock.

The core reads the files, analyses each on a thread of its own and keeps what it found as columns. A
result becomes Python objects when it is asked for its records, and those that it is asked for. Sources
that name an encoding other than UTF-8 are decoded by `_source`, under the lock.
"""

from __future__ import annotations

import os
from collections.abc import Generator, Iterable, Iterator, Sequence
from types import TracebackType
from typing import NamedTuple, Union, cast, overload

from quillet._languages import available_cores, decode_source, native_language_of
from quillet._names import FileBindings
from quillet._records import KINDS, RecordKind
from quillet.tarvex import _host

StrPath = Union[str, bytes, "os.PathLike[str]", "os.PathLike[bytes]"]

# What the core knows as kinds, in its order.
# A file to analyse: its name, its source where that is at hand, and why it cannot be read where that is
# known.
BatchInput = tuple[bytes, bytes | None, bytes | None]
# How many records become objects at a time where all are iterated over.
_CHUNK = 4096


class FileRecord(NamedTuple):
    """One fact about one name, with its place and its scope.

    `line` and `column` are where the name stands, from 1, the column in UTF-8 bytes; a name that the
    source does not spell in one piece, or that stands for a keyword ("return", "yield", "*"), has the
    place of its statement. `scope` is dotted, such as "Shop.total", and empty for the module. The
    others are those of `Record`, except that a signature comment on the first line of a function's body
    gives facts about that function's parameters, by their names and with `is_parameter` true.
    """

    line: int
    column: int
    scope: str
    name: str
    kind: RecordKind
    detail: str
    is_parameter: bool


class Definition(NamedTuple):
    """A class, a function or a type alias: `kind` is "class", "def" or "type", `scope` what it opens.

    `line` and `column` are those of its name, `first_line` and `last_line` those of its head and of the
    last statement of its body. All count from 1.
    """

    scope: str
    kind: str
    line: int
    column: int
    first_line: int
    last_line: int


class FileRecords(Sequence[FileRecord]):
    """The records of a file, in the order in which they were found. Made when they are asked for."""

    def __init__(self, native: _host.FileResult) -> None:
        self._native = native

    def __len__(self) -> int:
        return self._native.record_count

    @overload
    def __getitem__(self, index: int) -> FileRecord: ...

    @overload
    def __getitem__(self, index: slice) -> Sequence[FileRecord]: ...

    def __getitem__(self, index: int | slice) -> FileRecord | Sequence[FileRecord]:
        places = range(len(self))[index]
        if isinstance(places, int):
            [record] = self._native.Rows(places, places + 1, FileRecord, KINDS)
            return cast(FileRecord, record)
        if places.step == 1:
            return self._native.Rows(places.start, places.stop, FileRecord, KINDS)
        return [self[place] for place in places]

    def __iter__(self) -> Iterator[FileRecord]:
        for start in range(0, len(self), _CHUNK):
            yield from self._native.Rows(start, start + _CHUNK, FileRecord, KINDS)

    def plain(self) -> list[tuple[int, int, str, str, str, str, bool]]:
        """All records as plain tuples, with the kind as a plain str: for a database."""
        return self._native.Rows(0, len(self), tuple, _host.RECORD_KIND_WORDS)


class FileAnalysis:
    """What `analyze_files` found in one file.

    `path` is the name that was given. `problem` says why the file could not be analysed, and is None
    where it was; then `lines` counts its physical lines and `statements` its logical lines that are
    neither blank nor a comment. `errors` are its syntax errors as (line, column, message), lines and
    columns from 1, columns in UTF-8 bytes. `reports` are statements that the analysis gave up for a
    reason other than their syntax, in the same form.
    """

    __slots__ = ("_bindings", "_native", "path")

    def __init__(self, path: str, native: _host.FileResult) -> None:
        self.path = path
        self._native = native
        self._bindings: FileBindings | None = None

    @property
    def problem(self) -> str | None:
        return self._native.problem

    @property
    def size(self) -> int:
        """The size of the file in bytes."""
        return self._native.byte_count

    @property
    def lines(self) -> int:
        return self._native.line_count

    @property
    def statements(self) -> int:
        return self._native.statement_count

    @property
    def errors(self) -> list[tuple[int, int, str]]:
        return self._native.errors

    @property
    def reports(self) -> list[tuple[int, int, str]]:
        return self._native.reports

    @property
    def records(self) -> FileRecords:
        return FileRecords(self._native)

    @property
    def definitions(self) -> list[Definition]:
        """The classes, functions and type aliases, in the order in which they begin."""
        return self._native.Definitions(Definition)

    @property
    def bindings(self) -> FileBindings:
        """The names of the file, as `bind` gives them. Raises `ValueError` where they were not asked for, by
        `bindings=True`, and where the file has a problem.
        """
        if self._bindings is None:
            names = self._native.names
            if names is None:
                raise ValueError(self.problem or "analyze_files was not asked for bindings")
            self._bindings = FileBindings(names)
        return self._bindings

    def __repr__(self) -> str:
        what = self.problem or f"{self.lines} lines, {len(self.records)} records"
        return f"<FileAnalysis {self.path!r}: {what}>"


class OccurrenceColumns:
    """The occurrences of all files of `analyze_files` that are left, for readers of the Arrow C data interface.

    A row is an occurrence. `path` is that of its file, `index` and `receiver` are its place and that of its receiver
    among the file's occurrences, `scope` is the index of its scope, `scope_name` the dotted name of the class or
    function in which that stands, `symbol` the number of its variable in the file and `symbol_name` the name of that.
    Each flag is a column of truth values. The others are those of `Occurrence`.
    """

    def __init__(self, native: _host.Batch, has_bindings: bool) -> None:
        self._native = native
        self._has_bindings = has_bindings

    def __arrow_c_stream__(self, requested_schema: object = None) -> object:
        """A capsule of the stream. The schema is fixed."""
        if not self._has_bindings:
            raise ValueError("analyze_files was not asked for bindings")
        return self._native.OccurrenceStream()


class FileAnalyses(Iterator[FileAnalysis]):
    """The results of `analyze_files`, one a file, in the order of the paths. They are handed out once.

    Threads run while results are asked for, and a little ahead. `close`, or the end of a `with` block,
    stops them; so does dropping the object.
    """

    def __init__(self, paths: list[str], native: _host.Batch, has_bindings: bool) -> None:
        self._paths = paths
        self._native = native
        self._has_bindings = has_bindings

    def __next__(self) -> FileAnalysis:
        result = self._native.Next()
        if result is None:
            raise StopIteration
        return FileAnalysis(self._paths[result.index], result)

    def __arrow_c_stream__(self, requested_schema: object = None) -> object:
        """The records of all files that are left, as columns, for readers of the Arrow C data interface.

        The columns are `path` and those of `FileRecord`. The schema is fixed: a reader that asks for another
        one converts what it gets. Files with a problem have no records; `problems` names them.
        """
        return self._native.ArrowStream()

    @property
    def occurrences(self) -> OccurrenceColumns:
        """The names of all files that are left, as columns: `pyarrow.table(results.occurrences)`."""
        return OccurrenceColumns(self._native, self._has_bindings)

    @property
    def problems(self) -> list[tuple[str, str]]:
        """The files so far that could not be analysed, as (path, reason)."""
        return [(self._paths[index], reason) for index, reason in self._native.problems]

    def start(self) -> None:
        """Sets the threads to work at once. Without it they begin when the first result is asked for."""
        self._native.Start()

    def close(self) -> None:
        """Stops after the files under way. There are no results after it."""
        self._native.Cancel()

    def __enter__(self) -> FileAnalyses:
        return self

    def __exit__(
        self, exc_type: type[BaseException] | None, exc: BaseException | None, traceback: TracebackType | None
    ) -> None:
        self.close()


def analyze_files(
    paths: Iterable[StrPath | tuple[StrPath, bytes]],
    *,
    version: tuple[int, ...] | None = None,
    jobs: int | None = None,
    bindings: bool = False,
    exact: bool = False,
) -> FileAnalyses:
    """Analyses files, on `jobs` threads (one a core without it), and yields a result a file in order.

    A path may be given with its source, as a tuple (path, bytes): then nothing is read. `version` is the
    Python that the files are written for, as for `analyze`. With `bindings`, each result has the names of its
    file as well, as `bind` gives them. `exact` is that of `analyze`.

    No file ends the run: one that cannot be read, or whose encoding is unknown, is a result with a
    `problem`. Raises `TypeError` and `ValueError` for wrong arguments.

    >>> [result] = analyze_files([("shop.py", b"class Shop:\\n    def total(self): pass\\n")])
    >>> for record in result.records:
    ...     print((record.line, record.column, record.scope, record.name, record.kind.value))
    (1, 7, '', 'Shop', 'set')
    (2, 9, 'Shop', 'total', 'set')
    (2, 15, 'Shop.total', 'self', 'set')
    """
    language = native_language_of(version, exact=exact)
    count = jobs_of(jobs)
    names: list[str] = []
    inputs: list[BatchInput] = []
    for item in paths:
        path, source = item if isinstance(item, tuple) else (item, None)
        if source is not None and not isinstance(source, bytes):
            raise TypeError(f"a source must be bytes, not {type(source).__name__}")
        names.append(os.fsdecode(path))
        inputs.append((os.fsencode(path), source, None))
    return FileAnalyses(names, _host.Batch(language, inputs, count, decode_source, None, bindings), bindings)


def write_files(
    inputs: Iterable[BatchInput],
    *,
    version: tuple[int, ...] | None,
    jobs: int | None,
    form: tuple[object, ...],
    exact: bool = False,
) -> Generator[_host.FileResult, None, None]:
    """Analyses files and writes what was found: the buffer of each result is the text of a format.

    The formats are ("jsonl", errors_only) and ("text", errors_only, colours, width_of), where `width_of`
    gives the cells that a code point takes on a terminal.
    """
    batch = _host.Batch(native_language_of(version, exact=exact), inputs, jobs_of(jobs), decode_source, form, False)
    try:
        while (result := batch.Next()) is not None:
            yield result
    finally:
        batch.Cancel()


def jobs_of(jobs: int | None) -> int:
    """The number of threads for an argument; one a core for None."""
    if jobs is None:
        return available_cores()
    if not isinstance(jobs, int) or isinstance(jobs, bool):
        raise TypeError(f"jobs must be a number, not {jobs!r}")
    if not 1 <= jobs <= 1024:
        raise ValueError(f"jobs must be from 1 to 1024, not {jobs}")
    return jobs


def native_batch(version: tuple[int, ...] | None = None, *, exact: bool = False) -> _host.NativeBatch:
    """Sources in memory through the native path, for measuring: counts and no objects."""
    return _host.NativeBatch(native_language_of(version, exact=exact))
