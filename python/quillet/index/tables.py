"""Writes the records of files as tables of an SQLite database, for questions in SQL.

A database is written anew each time, beside its place, and then put there. The trap: the number of a record
holds its file's, so that a file's records lie together and go by one range, without an index on the file.
"""

from __future__ import annotations

import gc
import os
import sqlite3
from collections.abc import Iterator
from contextlib import contextmanager, suppress
from typing import NamedTuple

from quillet._batch import FileAnalysis, FileRecords, TextNumbers, analyze_files
from quillet.index.source import content_hash
from quillet.index.store import KINDS, IndexProblem, explained
from quillet.index.writing import check_place, engine_mark

APPLICATION_ID = 0x51554C54  # "QULT"
SCHEMA = 1
# A record's number is its file's number, shifted, and its place in the file.
FILE_SHIFT = 24
MAX_RECORDS = 1 << FILE_SHIFT
# Records that one statement writes: SQLite takes 999 variables everywhere.
_ROWS_AT_ONCE = 64
_RECORD_COLUMNS = 9

_TABLES = f"""
CREATE TABLE meta (key TEXT PRIMARY KEY, value) WITHOUT ROWID;
CREATE TABLE kinds (id INTEGER PRIMARY KEY, kind TEXT NOT NULL);
CREATE TABLE files (
  id INTEGER PRIMARY KEY,
  path BLOB NOT NULL UNIQUE,
  size INTEGER NOT NULL,
  mtime_ns INTEGER NOT NULL,
  hash BLOB,
  made_by TEXT NOT NULL,
  lines INTEGER NOT NULL,
  records INTEGER NOT NULL,
  problem TEXT
);
CREATE TABLE names (id INTEGER PRIMARY KEY, name TEXT NOT NULL, tail TEXT NOT NULL);
CREATE TABLE details (id INTEGER PRIMARY KEY, detail TEXT NOT NULL);
CREATE TABLE records (
  id INTEGER PRIMARY KEY,
  name INTEGER NOT NULL,
  scope INTEGER NOT NULL,
  line INTEGER NOT NULL,
  column INTEGER NOT NULL,
  kind INTEGER NOT NULL,
  is_parameter INTEGER NOT NULL,
  opens INTEGER NOT NULL,
  detail INTEGER NOT NULL
);
CREATE TABLE errors (
  id INTEGER PRIMARY KEY,
  line INTEGER NOT NULL,
  column INTEGER NOT NULL,
  message TEXT NOT NULL
);
CREATE VIEW facts AS
  SELECT CAST(f.path AS TEXT) AS path, r.line AS line, r.column AS column, s.name AS scope, n.name AS name,
         k.kind AS kind, d.detail AS detail, r.is_parameter AS is_parameter
    FROM records r
    JOIN files f ON f.id = r.id >> {FILE_SHIFT}
    JOIN names n ON n.id = r.name
    JOIN names s ON s.id = r.scope
    JOIN kinds k ON k.id = r.kind
    JOIN details d ON d.id = r.detail;
"""
# Made last, when all rows can be sorted at once.
INDICES = """
CREATE UNIQUE INDEX names_by_name ON names (name);
CREATE INDEX names_by_tail ON names (tail);
CREATE UNIQUE INDEX details_by_detail ON details (detail);
CREATE INDEX records_by_name ON records (name, scope);
"""


class Source(NamedTuple):
    """The files of the tables: where each lies, and as what the tables name it."""

    paths: list[str]
    stored: list[bytes]
    version: tuple[int, int]
    jobs: int | None = None


class TablesOutcome(NamedTuple):
    """What was written, and the files that could not be analysed with the reasons why."""

    files: int
    records: int
    problems: list[tuple[str, str]]


@contextmanager
def replacing(target: str) -> Iterator[str]:
    """The name of a file to write, which takes the target's place at the end. Raises `IndexProblem`."""
    check_place(target)
    unfinished = f"{target}.part"
    with explained(target):
        try:
            with suppress(FileNotFoundError):
                os.unlink(unfinished)
            os.close(os.open(unfinished, os.O_WRONLY | os.O_CREAT | os.O_EXCL, 0o666))
            yield unfinished
            os.replace(unfinished, target)
        finally:
            with suppress(OSError):
                os.unlink(unfinished)


def write_sqlite(source: Source, target: str) -> TablesOutcome:
    """Analyses files and writes their records into a new database. Raises `IndexProblem`."""
    with replacing(target) as unfinished:
        try:
            connection = sqlite3.connect(unfinished, isolation_level=None)
            try:
                return _Tables(connection, source).write()
            finally:
                connection.close()
        except sqlite3.Error as error:
            raise IndexProblem(f"{target}: {error}; check the space on the disk") from error


def prepare(connection: sqlite3.Connection) -> None:
    """Makes the tables in an empty database."""
    # Nobody else sees the file, and one that is not finished is thrown away.
    connection.execute("PRAGMA journal_mode=OFF")
    connection.execute("PRAGMA synchronous=OFF")
    connection.execute("PRAGMA cache_size=-65536")
    connection.executescript(f"{_TABLES} PRAGMA application_id={APPLICATION_ID}; PRAGMA user_version={SCHEMA};")


class _Tables:
    def __init__(self, connection: sqlite3.Connection, source: Source) -> None:
        self._connection = connection
        self._source = source
        self._problems: list[tuple[str, str]] = []
        self._records = 0
        self._made_by = engine_mark()

    def write(self) -> TablesOutcome:
        connection = self._connection
        prepare(connection)
        connection.execute("BEGIN")
        connection.executemany("INSERT INTO kinds VALUES (?, ?)", enumerate(KINDS))
        connection.execute("INSERT INTO meta VALUES ('python', ?)", ("{}.{}".format(*self._source.version),))
        self._names = _Texts(connection, "INSERT INTO names VALUES (?, ?, ?)", with_tail=True)
        self._details = _Texts(connection, "INSERT INTO details VALUES (?, ?)", with_tail=False)
        source = self._source
        with _no_collection(), analyze_files(source.paths, version=source.version, jobs=source.jobs) as analyses:
            for number, (stored, analysis) in enumerate(zip(source.stored, analyses, strict=True), 1):
                self._write_file(number, stored, analysis)
        connection.execute("COMMIT")
        connection.executescript(INDICES)
        return TablesOutcome(len(source.paths), self._records, self._problems)

    def _write_file(self, number: int, stored: bytes, analysis: FileAnalysis) -> None:
        records = analysis.records
        errors = sorted([*analysis.errors, *analysis.reports])
        problem = analysis.problem
        if problem is None and max(len(records), len(errors)) >= MAX_RECORDS:
            problem = "the file is too large for the tables"
        if problem is not None:
            self._problems.append((analysis.path, problem))
        status = _status_of(analysis.path)
        count = len(records) if problem is None else 0
        row = (number, stored, *status, content_hash(analysis.path), self._made_by, analysis.lines, count, problem)
        self._connection.execute("INSERT INTO files VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?)", row)
        if problem is None:
            self._records += count
            self._write_records(records, number << FILE_SHIFT)
            numbered = ((place, *error) for place, error in enumerate(errors, number << FILE_SHIFT))
            self._connection.executemany("INSERT INTO errors VALUES (?, ?, ?, ?)", numbered)

    def _write_records(self, records: FileRecords, first_id: int) -> None:
        texts = records.texts()
        numbers = TextNumbers(
            self._names.numbers_of(texts.names),
            self._names.numbers_of(texts.scopes),
            self._details.numbers_of(texts.details),
        )
        for tuples in records.numbered(first_id, numbers, _ROWS_AT_ONCE):
            self._connection.executemany(INSERT_RECORDS[len(tuples[0])], tuples)


# The statements for many records and for one, by the number of their variables.
_ROW = f"({', '.join('?' * _RECORD_COLUMNS)})"
INSERT_RECORDS = {
    rows * _RECORD_COLUMNS: f"INSERT INTO records VALUES {', '.join([_ROW] * rows)}" for rows in (1, _ROWS_AT_ONCE)
}


class _Texts:
    """The numbers of the texts of one table; that of no text is 0."""

    def __init__(self, connection: sqlite3.Connection, insert: str, *, with_tail: bool) -> None:
        self._connection = connection
        self._insert = insert
        self._with_tail = with_tail
        self._numbers: dict[str, int] = {}
        self.numbers_of([""])

    def numbers_of(self, texts: list[str]) -> list[int]:
        """A number for each text; the table gets those that it does not have."""
        numbers = self._numbers
        new = [text for text in texts if text not in numbers]
        if new:
            numbered = list(enumerate(new, len(numbers)))
            numbers.update((text, number) for number, text in numbered)
            rows = [(number, text, _tail_of(text)) for number, text in numbered] if self._with_tail else numbered
            self._connection.executemany(self._insert, rows)
        return list(map(numbers.__getitem__, texts))


def _tail_of(name: str) -> str:
    """What stands behind the last dot, by which names are found from their end."""
    return name.rpartition(".")[2]


def _status_of(path: str) -> tuple[int, int]:
    try:
        status = os.stat(path)
    except (OSError, ValueError):
        return 0, 0
    return status.st_size, status.st_mtime_ns


@contextmanager
def _no_collection() -> Iterator[None]:
    """Keeps the collector of cycles from looking at rows without number, none of which is in a cycle."""
    enabled = gc.isenabled()
    gc.disable()
    try:
        yield
    finally:
        if enabled:
            gc.enable()
