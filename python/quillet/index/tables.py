"""Writes the records of files as tables of an SQLite database, for questions in SQL.

A database is written anew each time, beside its place, and then put there: empty tables by SQLite, the records and
their index as pages by the core, which takes a fraction of the time that statements would, and everything else by
SQLite again. The trap: the number of a record holds its file's, so that a file's records lie together and go by
one range, without an index on the file.
"""

from __future__ import annotations

import os
import sqlite3
from collections.abc import Iterator
from contextlib import closing, contextmanager, suppress
from typing import Any, NamedTuple

from quillet._batch import jobs_of
from quillet._languages import decode_source, native_language_of
from quillet.index.source import content_hash
from quillet.index.store import KINDS, IndexProblem, explained
from quillet.index.writing import check_place, engine_mark
from quillet.tarvex import _host

APPLICATION_ID = 0x51554C54  # "QULT"
SCHEMA = 1
# A record's number is its file's number, shifted, and its place in the file.
FILE_SHIFT = 24
MAX_RECORDS = 1 << FILE_SHIFT
# The bytes in front of a database's first page that are looked at, and where they hold the number of its pages.
_HEAD_SIZE = 100
_PAGE_COUNT_AT = 28
# How many texts become objects at a time.
_CHUNK = 4096

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
RECORD_INDEX = "CREATE INDEX records_by_name ON records (name, scope);"
# Made last, when all rows can be sorted at once.
TEXT_INDICES = """
CREATE UNIQUE INDEX names_by_name ON names (name);
CREATE INDEX names_by_tail ON names (tail);
CREATE UNIQUE INDEX details_by_detail ON details (detail);
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
            return _Tables(unfinished, source).write()
        except sqlite3.Error as error:
            raise IndexProblem(f"{target}: {error}; check the space on the disk") from error


def open_unshared(path: str) -> sqlite3.Connection:
    """A database that nobody else sees, and that is thrown away where it is not finished."""
    connection = sqlite3.connect(path, isolation_level=None)
    for pragma in ("journal_mode=OFF", "synchronous=OFF", "cache_size=-65536"):
        connection.execute(f"PRAGMA {pragma}")
    return connection


def make_tables(connection: sqlite3.Connection) -> None:
    """Makes the tables in an empty database."""
    connection.executescript(
        f"PRAGMA auto_vacuum=NONE; {_TABLES} PRAGMA application_id={APPLICATION_ID}; PRAGMA user_version={SCHEMA};"
    )


class _Tables:
    def __init__(self, path: str, source: Source) -> None:
        self._path = path
        self._source = source
        self._made_by = engine_mark()
        self._records = 0
        # Rows of two tables.
        self._files: list[tuple[Any, ...]] = []
        self._errors: list[tuple[int, int, int, str]] = []

    def write(self) -> TablesOutcome:
        with closing(open_unshared(self._path)) as connection:
            make_tables(connection)
            connection.execute(RECORD_INDEX)
            roots = dict(connection.execute("SELECT name, rootpage FROM sqlite_master"))
        with open(self._path, "r+b") as file:
            rows = _host.RecordRows(file.read(_HEAD_SIZE))
            file.seek(0, os.SEEK_END)
            for analysed in self._analysed():
                self._add_file(rows, analysed)
                file.write(rows.Take())
            table = rows.FinishTable()
            while rows.AddToIndex():
                file.write(rows.Take())
            index = rows.FinishIndex()
            file.write(rows.Take())
            for name, root in (("records", table), ("records_by_name", index)):
                file.seek((roots[name] - 1) * rows.page_size)
                file.write(root)
            file.seek(_PAGE_COUNT_AT)
            file.write(rows.page_count.to_bytes(4, "big"))
        with closing(open_unshared(self._path)) as connection:
            connection.execute("BEGIN")
            self._insert_others(connection, rows)
            connection.execute("COMMIT")
            connection.executescript(TEXT_INDICES)
        problems = [
            (path, row[-1]) for path, row in zip(self._source.paths, self._files, strict=True) if row[-1] is not None
        ]
        return TablesOutcome(len(self._files), self._records, problems)

    def _analysed(self) -> Iterator[_host.FileResult]:
        source = self._source
        inputs = [(os.fsencode(path), None, None) for path in source.paths]
        language = native_language_of(source.version)
        batch = _host.Batch(language, inputs, jobs_of(source.jobs), decode_source, None, False)
        try:
            while (result := batch.Next()) is not None:
                yield result
        finally:
            batch.Cancel()

    def _add_file(self, rows: _host.RecordRows, result: _host.FileResult) -> None:
        number, path = result.index + 1, self._source.paths[result.index]
        errors = sorted([*result.errors, *result.reports])
        count, problem = result.record_count, result.problem
        if problem is None and max(count, len(errors)) >= MAX_RECORDS:
            problem = "the file is too large for the tables"
        if problem is None:
            rows.Add(result, number << FILE_SHIFT)
            self._records += count
            self._errors += ((place, *error) for place, error in enumerate(errors, number << FILE_SHIFT))
        else:
            count = 0
        stored, mark = self._source.stored[result.index], self._made_by
        row = (number, stored, *_status_of(path), content_hash(path), mark, result.line_count, count, problem)
        self._files.append(row)

    def _insert_others(self, connection: sqlite3.Connection, rows: _host.RecordRows) -> None:
        insert = connection.executemany
        insert("INSERT INTO kinds VALUES (?, ?)", enumerate(KINDS))
        insert("INSERT INTO meta VALUES ('python', ?)", [("{}.{}".format(*self._source.version),)])
        insert("INSERT INTO files VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?)", self._files)
        insert("INSERT INTO errors VALUES (?, ?, ?, ?)", self._errors)
        for texts, statement in (
            (rows.Names, "INSERT INTO names VALUES (?, ?, ?)"),
            (rows.Details, "INSERT INTO details VALUES (?, ?)"),
        ):
            begin = 0
            while found := texts(begin, begin + _CHUNK):
                insert(statement, found)
                begin += len(found)


def _status_of(path: str) -> tuple[int, int]:
    try:
        status = os.stat(path)
    except (OSError, ValueError):
        return 0, 0
    return status.st_size, status.st_mtime_ns
