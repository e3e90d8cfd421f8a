"""Many files at once: paths in, records out, on all cores and without the interpreter lock.

The core reads the files, analyses each on a thread of its own and keeps what it found as columns. A
result becomes Python objects when it is asked for its records, and those that it is asked for. Sources
that name an encoding other than UTF-8 are decoded by `_source`, under the lock.
"""

from __future__ import annotations

import os
from _thread import RLock
from collections.abc import Callable, Generator, Iterable, Iterator, Sequence, Sized
from types import TracebackType
from typing import NamedTuple, NoReturn, Union, cast, overload

from quillet._languages import available_cores, decode_source, native_language_of
from quillet._names import FileBindings
from quillet._records import KINDS, RecordKind
from quillet.tarvex import _host

StrPath = Union[str, bytes, "os.PathLike[str]", "os.PathLike[bytes]"]
PathOrSource = StrPath | tuple[StrPath, str | bytes | bytearray | memoryview]

# What the core knows as kinds, in its order.
# A file to analyse: its name, its source where that is at hand (as a bytearray where it was text), and why it cannot
# be read where that is known.
BatchInput = tuple[bytes, bytes | bytearray | None, bytes | None]
# How many inputs of a generator are read ahead at first and at most, and the bytes of source at most.
_FIRST_AHEAD, _MOST_AHEAD = 8, 64
_MOST_BYTES_AHEAD = 32 << 20
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

    def __reduce__(self) -> tuple[Callable[[bytes], FileRecords], tuple[bytes]]:
        return _records_of_bytes, (self._native.ToBytes(),)

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

    def __reduce__(self) -> tuple[Callable[[str, bytes], FileAnalysis], tuple[str, bytes]]:
        return _analysis_of_bytes, (self.path, self._native.ToBytes())

    def __repr__(self) -> str:
        what = self.problem or f"{self.lines} lines, {len(self.records)} records"
        return f"<FileAnalysis {self.path!r}: {what}>"


def _analysis_of_bytes(path: str, data: bytes) -> FileAnalysis:
    return FileAnalysis(path, _host.FileResult.FromBytes(data))


def _records_of_bytes(data: bytes) -> FileRecords:
    return FileRecords(_host.FileResult.FromBytes(data))


class OccurrenceColumns:
    """The occurrences of all files of `analyze_files` that are left, for readers of the Arrow C data interface.

    A row is an occurrence. `path` is that of its file, `index` and `receiver` are its place and that of its receiver
    among the file's occurrences, `scope` is the index of its scope, `scope_name` the dotted name of the class or
    function in which that stands, `symbol` the number of its variable in the file and `symbol_name` the name of that.
    Each flag is a column of truth values. The others are those of `Occurrence`.
    """

    def __init__(self, batch: Callable[[], _host.Batch], has_bindings: bool) -> None:
        self._batch = batch
        self._has_bindings = has_bindings

    def __arrow_c_stream__(self, requested_schema: object = None) -> object:
        """A capsule of the stream. The schema is fixed."""
        if not self._has_bindings:
            raise ValueError("analyze_files was not asked for bindings")
        return self._batch().OccurrenceStream()


class _Part:
    """Some of the files, and the threads that analyse them."""

    def __init__(self, names: list[str], native: _host.Batch) -> None:
        self.names = names
        self.native = native

    def problems(self) -> list[tuple[str, str]]:
        return [(self.names[index], reason) for index, reason in self.native.problems]


class FileAnalyses(Iterator[FileAnalysis]):
    """The results of `analyze_files`, one a file, in the order of the paths. They are handed out once.

    Threads run while results are asked for, and a little ahead. `close`, or the end of a `with` block,
    stops them; so does dropping the object. It is read by its own process alone.
    """

    def __init__(
        self,
        paths: Iterable[PathOrSource],
        make_batch: Callable[[list[BatchInput]], _host.Batch],
        has_bindings: bool,
    ) -> None:
        self._make_batch = make_batch
        self._has_bindings = has_bindings
        self._lock = RLock()
        self._problems: list[tuple[str, str]] = []  # of parts that are over
        self._failure: Exception | None = None  # that the generator raised
        self._ahead = _FIRST_AHEAD
        self._left: Iterator[PathOrSource] | None = None  # what of a generator was not read yet
        # What is being handed out, and what is worked on meanwhile.
        self._now: _Part | None = None
        self._later: _Part | None = None
        if isinstance(paths, Sized):
            self._now = self._part_of(iter(paths), None)
            self._raise_failure()
        else:
            self._left = iter(paths)

    def __next__(self) -> FileAnalysis:
        while True:
            part = self._part()
            if part is None:
                raise StopIteration
            result = part.native.Next()
            if result is not None:
                return FileAnalysis(part.names[result.index], result)
            self._go_on_behind(part)

    def __arrow_c_stream__(self, requested_schema: object = None) -> object:
        """The records of all files that are left, as columns, for readers of the Arrow C data interface.

        The columns are `path` and those of `FileRecord`. The schema is fixed: a reader that asks for another
        one converts what it gets. Files with a problem have no records; `problems` names them. The dictionary of
        paths has all of them, so a generator is read to its end first.
        """
        return self._whole().ArrowStream()

    def __reduce__(self) -> NoReturn:
        raise TypeError("the results of analyze_files are pickled one by one")

    @property
    def occurrences(self) -> OccurrenceColumns:
        """The names of all files that are left, as columns: `pyarrow.table(results.occurrences)`."""
        return OccurrenceColumns(self._whole, self._has_bindings)

    @property
    def problems(self) -> list[tuple[str, str]]:
        """The files so far that could not be analysed, as (path, reason)."""
        with self._lock:
            now = self._now
            return self._problems + (now.problems() if now is not None else [])

    def start(self) -> None:
        """Sets the threads to work at once. Without it they begin when the first result is asked for."""
        part = self._part()
        if part is not None:
            part.native.Start()

    def close(self) -> None:
        """Stops after the files under way. There are no results after it."""
        self._left = self._failure = None
        for part in (self._now, self._later):
            if part is not None:
                part.native.Cancel()
        self._later = None

    def __enter__(self) -> FileAnalyses:
        return self

    def __exit__(
        self, exc_type: type[BaseException] | None, exc: BaseException | None, traceback: TracebackType | None
    ) -> None:
        self.close()

    def _part(self) -> _Part | None:
        """What is handed out now; the first of a generator is read for it."""
        with self._lock:
            if self._now is None and self._left is not None:
                self._now = self._next_part()
                if self._now is None:
                    self._raise_failure()
                else:
                    self._now.native.Start()
                    self._later = self._next_part()
            return self._now

    def _go_on_behind(self, part: _Part) -> None:
        """Puts the next part in the place of one that is over; ends where there is none."""
        with self._lock:
            if self._now is not part:
                return  # another thread did
            if self._later is None:
                self._raise_failure()
                raise StopIteration
            self._problems += part.problems()
            self._now, self._later = self._later, None
            self._later = self._next_part()

    def _next_part(self) -> _Part | None:
        """The next inputs of a generator, at work."""
        if self._left is None:
            return None
        part = self._part_of(self._left, self._ahead)
        self._ahead = min(2 * self._ahead, _MOST_AHEAD)
        if not part.names:
            return None
        part.native.Start()
        return part

    def _part_of(self, left: Iterator[PathOrSource], most: int | None) -> _Part:
        """Inputs with a batch of their own, `most` at most. What the iterator raises is for behind them."""
        names: list[str] = []
        inputs: list[BatchInput] = []
        held = 0
        try:
            while most is None or (len(names) < most and held < _MOST_BYTES_AHEAD):
                name, given = _input_of(next(left))
                names.append(name)
                inputs.append(given)
                held += len(given[1] or b"")
        except StopIteration:
            self._left = None
        except Exception as error:
            self._left = None
            self._failure = error
        return _Part(names, self._make_batch(inputs))

    def _whole(self) -> _host.Batch:
        """All files that are left as one batch."""
        with self._lock:
            if self._now is None:
                self._now = self._part_of(self._left or iter(()), None)
                self._raise_failure()
            elif self._left is not None or self._later is not None:
                raise ValueError("the columns of a generator's files are read from its beginning")
            return self._now.native

    def _raise_failure(self) -> None:
        failure, self._failure = self._failure, None
        if failure is not None:
            raise failure


def _input_of(item: PathOrSource) -> tuple[str, BatchInput]:
    path, source = item if isinstance(item, tuple) else (item, None)
    if isinstance(source, str):
        source = bytearray(source.encode("utf-8", "surrogatepass"))
    elif source is not None and not isinstance(source, bytes):
        try:
            source = memoryview(source).tobytes()
        except TypeError:
            raise TypeError(f"a source must be bytes or str, not {type(source).__name__}") from None
    return os.fsdecode(path), (os.fsencode(path), source, None)


def analyze_files(
    paths: Iterable[PathOrSource],
    *,
    version: tuple[int, ...] | None = None,
    jobs: int | None = None,
    bindings: bool = False,
    exact: bool = False,
) -> FileAnalyses:
    """Analyses files, on `jobs` threads (one a core without it), and yields a result a file in order.

    A path may be given with its source, as a tuple (path, source): then nothing is read. A source is bytes or any other
    buffer, which is decoded as Python does, or a str, which is taken as it is. A generator is read as results are asked
    for, a little ahead; results pickle. `version` is the
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

    def make_batch(inputs: list[BatchInput]) -> _host.Batch:
        return _host.Batch(language, inputs, count, decode_source, None, bindings)

    return FileAnalyses(paths, make_batch, bindings)


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
