"""Brings an index up to date with the files on disk.

A file whose size and time of change are as they were is not opened; one whose content has the hash that
it had is not analysed. Files below the folders of the run that are gone leave the index. The trap: a file
may be written again within the clock's grain, so a time that is too young to trust is not kept; and size
and time are taken before the content, so that a change between the two is seen by the next run.
"""

from __future__ import annotations

import gc
import json
import os
import sqlite3
import sys
import time
from collections.abc import Callable, Iterator
from contextlib import contextmanager
from hashlib import blake2b
from typing import NamedTuple

from quillet._batch import (
    FileAnalyses,
    FileAnalysis,
    FileRecords,
    TextNumbers,
    analyze_files,
    available_cores,
)
from quillet.cli.files import find_files, problem_of, read_file
from quillet.index.paths import full_path, is_below, stored_path
from quillet.index.store import (
    FILE_SHIFT,
    INDICES,
    MAX_RECORDS,
    RECORD_COLUMNS,
    IndexProblem,
    explained,
    open_to_read,
    open_to_write,
    tail_of,
    write_lock,
)

# A change within this time of the last one could leave size and time as they are.
_GRAIN_NS = 2_000_000_000
_UNTRUSTED = -1
# A transaction takes about this much source: what an end at the worst moment loses.
_BATCH_BYTES = 1 << 22
_BATCH_FILES = 512
# Records that one statement writes: SQLite takes 999 variables everywhere.
_ROWS_AT_ONCE = 64
# The statements for that many records and for one, by the number of their variables.
_ROW = f"({', '.join('?' * RECORD_COLUMNS)})"
_INSERT_RECORDS = {
    rows * RECORD_COLUMNS: f"INSERT INTO records VALUES {', '.join([_ROW] * rows)}" for rows in (1, _ROWS_AT_ONCE)
}


class Settings(NamedTuple):
    """What a run is asked to do. Without paths it brings up to date what earlier runs named."""

    paths: tuple[str, ...]
    version: tuple[int, int] | None
    jobs: int | None
    gitignore: bool | None


class Outcome(NamedTuple):
    """What a run did."""

    files: int
    analysed: int
    removed: int
    unread: int
    records: int


class Reports(NamedTuple):
    """What a run calls while it goes on: with a file and the reason why it was not read, and when it waits."""

    unread: Callable[[str, str], None]
    waiting: Callable[[], None]


class _Known(NamedTuple):
    id: int
    size: int
    mtime_ns: int
    hash: bytes | None
    made_by: str
    problem: str | None


class _Candidate(NamedTuple):
    path: str
    stored: bytes
    size: int
    mtime_ns: int


class _Changes(NamedTuple):
    """What is to be done for a batch of files."""

    changed: list[tuple[_Candidate, bytes]]  # with the hash of the content
    analyses: FileAnalyses  # of those, in their order
    touched: list[tuple[int, int, int]]  # size, time of change and number of files with the content they had
    gone: list[int]  # the numbers of files that cannot be read any more


def update(index: str, settings: Settings, reports: Reports) -> Outcome:
    """Brings the index up to date and returns what was done. Raises `IndexProblem`."""
    index = os.path.abspath(index)
    folder = os.path.dirname(index)
    if not os.path.isdir(folder):
        raise IndexProblem(f"{index}: there is no folder {folder} to hold the index")
    with write_lock(index, reports.waiting), explained(index):
        connection = open_to_write(index)
        try:
            return _Run(connection, folder, settings, reports).run()
        finally:
            connection.close()


def engine_version() -> str:
    """The version of the engine, whose change makes all that was found before worth finding again."""
    from importlib.metadata import PackageNotFoundError, version

    try:
        return version("quillet")
    except PackageNotFoundError:  # run from a build folder
        return "0"


def watched_paths(index: str, settings: Settings) -> tuple[tuple[str, ...], bool]:
    """What a run with these settings looks at: the paths, and whether .gitignore files count."""
    base = os.path.dirname(os.path.abspath(index))
    connection = open_to_read(index)
    try:
        remembered = dict(connection.execute("SELECT key, value FROM meta"))
    finally:
        connection.close()
    roots = tuple(os.path.join(base, root) for root in json.loads(remembered["roots"]))
    return settings.paths or roots, bool(remembered["gitignore"])


class _Run:
    def __init__(self, connection: sqlite3.Connection, base: str, settings: Settings, reports: Reports) -> None:
        self._connection = connection
        self._base = base
        self._reports = reports
        # One core is busy with the database.
        self._jobs = settings.jobs or max(available_cores() - 1, 1)
        self._unread = 0
        self._analysed = 0
        self._removed = 0
        self._replaced = 0

        remembered = dict(connection.execute("SELECT key, value FROM meta"))
        roots: list[str] = [os.path.join(base, root) for root in json.loads(remembered.get("roots", "[]"))]
        if not settings.paths and not roots:
            raise IndexProblem("nothing was indexed yet; name what to index: quillet index PATH...")
        self._paths = settings.paths or tuple(roots)
        gitignore = settings.gitignore
        self._gitignore = bool(remembered.get("gitignore", 1)) if gitignore is None else gitignore
        version = settings.version
        if version is None and "python" in remembered:
            major, _, minor = str(remembered["python"]).partition(".")
            version = int(major), int(minor)
        self._version = version or sys.version_info[:2]
        python = "{}.{}".format(*self._version)
        self._made_by = f"quillet {engine_version()}, python {python}"
        named = [os.path.abspath(path) for path in settings.paths]
        roots = [root for root in dict.fromkeys([*roots, *named]) if os.path.exists(root)]
        relative = [os.fsdecode(stored_path(root, base)) for root in roots]
        values = {"roots": json.dumps(relative), "python": python, "gitignore": int(self._gitignore)}
        if any(remembered.get(key) != value for key, value in values.items()):
            connection.executemany("INSERT OR REPLACE INTO meta VALUES (?, ?)", values.items())

    def run(self) -> Outcome:
        connection = self._connection
        rows = connection.execute("SELECT path, id, size, mtime_ns, hash, made_by, problem FROM files")
        self._known = {row[0]: _Known(*row[1:]) for row in rows}
        self._next_id = max((known.id for known in self._known.values()), default=0) + 1
        empty = connection.execute("SELECT max(id) FROM names").fetchone()[0] == 0
        if not empty:
            self._make_indices()
        self._names = _Texts(connection, "names", "name", empty=empty)
        self._details = _Texts(connection, "details", "detail", empty=empty)
        seen: set[bytes] = set()
        with _no_collection():
            for changes in _one_ahead(self._changes(seen)):
                self._take(changes)
        self._remove_what_is_gone(seen)
        self._prune()
        self._make_indices()
        files, records = connection.execute("SELECT count(*), coalesce(sum(records), 0) FROM files").fetchone()
        return Outcome(files, self._analysed, self._removed, self._unread, records)

    def _make_indices(self) -> None:
        for statement in INDICES:
            self._connection.execute(statement)

    def _report(self, path: str, problem: str) -> None:
        self._unread += 1
        self._reports.unread(path, problem)

    def _batches(self, seen: set[bytes]) -> Iterator[list[_Candidate]]:
        """The files that may have changed, in batches; all files that are there are added to `seen`."""
        batch: list[_Candidate] = []
        size = 0
        for candidate in self._candidates(seen):
            batch.append(candidate)
            size += candidate.size
            if size >= _BATCH_BYTES or len(batch) >= _BATCH_FILES:
                yield batch
                batch, size = [], 0
        if batch:
            yield batch

    def _candidates(self, seen: set[bytes]) -> Iterator[_Candidate]:
        for item in find_files(self._paths, gitignore=self._gitignore):
            if item.problem is not None:
                self._report(item.path, item.problem)
                continue
            try:
                status = os.stat(item.path)
            except OSError as error:
                self._report(item.path, problem_of(error))
                continue
            except ValueError as error:  # a NUL in the name
                self._report(item.path, str(error))
                continue
            stored = stored_path(item.path, self._base)
            if stored in seen:
                continue
            seen.add(stored)
            known = self._known.get(stored)
            if (
                known is not None
                and known.made_by == self._made_by
                and known.size == status.st_size
                and known.mtime_ns == status.st_mtime_ns
            ):
                if known.problem is not None:
                    self._report(item.path, known.problem)
                continue
            trusted = time.time_ns() - status.st_mtime_ns > _GRAIN_NS
            yield _Candidate(item.path, stored, status.st_size, status.st_mtime_ns if trusted else _UNTRUSTED)

    def _changes(self, seen: set[bytes]) -> Iterator[_Changes]:
        """What there is to do for each batch of files, with the analysis under way."""
        for batch in self._batches(seen):
            changed: list[tuple[_Candidate, bytes]] = []
            sources: list[tuple[str, bytes]] = []
            touched: list[tuple[int, int, int]] = []
            gone: list[int] = []
            for candidate in batch:
                known = self._known.get(candidate.stored)
                try:
                    source = read_file(candidate.path)
                except OSError as error:
                    self._report(candidate.path, problem_of(error))
                    if known is not None:
                        gone.append(known.id)
                    continue
                digest = blake2b(source, digest_size=16).digest()
                if known is None or known.hash != digest or known.made_by != self._made_by:
                    changed.append((candidate, digest))
                    sources.append((candidate.path, source))
                    continue
                if known.problem is not None:
                    self._report(candidate.path, known.problem)
                if (known.size, known.mtime_ns) != (candidate.size, candidate.mtime_ns):
                    touched.append((candidate.size, candidate.mtime_ns, known.id))
            if changed or touched or gone:
                analyses = analyze_files(sources, version=self._version, jobs=self._jobs)
                analyses.start()
                yield _Changes(changed, analyses, touched, gone)

    def _take(self, changes: _Changes) -> None:
        """Brings the index up to date with a batch of files, in one transaction."""
        with changes.analyses, self._transaction() as connection:
            connection.executemany("UPDATE files SET size = ?, mtime_ns = ? WHERE id = ?", changes.touched)
            self._remove(changes.gone)
            for (candidate, digest), analysis in zip(changes.changed, changes.analyses, strict=True):
                self._write(candidate, digest, analysis)

    def _write(self, candidate: _Candidate, digest: bytes, analysis: FileAnalysis) -> None:
        connection = self._connection
        known = self._known.get(candidate.stored)
        if known is None:
            number = self._next_id
            self._next_id += 1
        else:
            number = known.id
            self._delete_rows(number)
        records = analysis.records
        errors = sorted([*analysis.errors, *analysis.reports])
        problem = analysis.problem
        if problem is None and (len(records) >= MAX_RECORDS or len(errors) >= MAX_RECORDS):
            problem = "the file is too large for the index"
        if problem is not None:
            self._report(candidate.path, problem)
        connection.execute(
            "INSERT INTO files VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?)",
            (
                number,
                candidate.stored,
                candidate.size,
                candidate.mtime_ns,
                digest,
                self._made_by,
                analysis.lines,
                len(records) if problem is None else 0,
                problem,
            ),
        )
        self._analysed += 1
        if problem is None:
            self._write_records(records, number << FILE_SHIFT)
            numbered = ((number, *error) for number, error in enumerate(errors, number << FILE_SHIFT))
            connection.executemany("INSERT INTO errors VALUES (?, ?, ?, ?)", numbered)

    def _write_records(self, records: FileRecords, first_id: int) -> None:
        texts = records.texts()
        numbers = TextNumbers(
            self._names.numbers_of(texts.names),
            self._names.numbers_of(texts.scopes),
            self._details.numbers_of(texts.details),
        )
        for tuples in records.numbered(first_id, numbers, _ROWS_AT_ONCE):
            self._connection.executemany(_INSERT_RECORDS[len(tuples[0])], tuples)

    def _remove_what_is_gone(self, seen: set[bytes]) -> None:
        roots = [os.path.abspath(path) for path in self._paths]
        gone = []
        for stored, known in self._known.items():
            if stored not in seen:
                path = full_path(stored, self._base)
                if any(is_below(path, root) for root in roots):
                    gone.append(known.id)
        if gone:
            with self._transaction():
                self._remove(gone)

    def _remove(self, numbers: list[int]) -> None:
        for number in numbers:
            self._delete_rows(number)
        self._removed += len(numbers)

    def _delete_rows(self, number: int) -> None:
        connection = self._connection
        ends = (number << FILE_SHIFT, (number + 1) << FILE_SHIFT)
        connection.execute("DELETE FROM records WHERE id >= ? AND id < ?", ends)
        connection.execute("DELETE FROM errors WHERE id >= ? AND id < ?", ends)
        connection.execute("DELETE FROM files WHERE id = ?", (number,))
        self._replaced += 1

    def _prune(self) -> None:
        """Drops the texts that no record has any more, once as many files were replaced as there are."""
        connection = self._connection
        if self._replaced == 0:
            return
        with self._transaction():
            row = connection.execute("SELECT value FROM meta WHERE key = 'replaced'").fetchone()
            replaced = (row[0] if row else 0) + self._replaced
            if replaced > connection.execute("SELECT count(*) FROM files").fetchone()[0]:
                connection.execute(
                    "DELETE FROM names WHERE id <> 0 AND id NOT IN"
                    " (SELECT name FROM records UNION SELECT scope FROM records)"
                )
                connection.execute("DELETE FROM details WHERE id <> 0 AND id NOT IN (SELECT detail FROM records)")
                replaced = 0
            connection.execute("INSERT OR REPLACE INTO meta VALUES ('replaced', ?)", (replaced,))

    @contextmanager
    def _transaction(self) -> Iterator[sqlite3.Connection]:
        self._connection.execute("BEGIN IMMEDIATE")
        try:
            yield self._connection
        except BaseException:
            self._connection.execute("ROLLBACK")
            raise
        self._connection.execute("COMMIT")


def _one_ahead(batches: Iterator[_Changes]) -> Iterator[_Changes]:
    """Gives each batch when the next one is under way."""
    before = None
    for changes in batches:
        if before is not None:
            yield before
        before = changes
    if before is not None:
        yield before


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


class _Texts:
    """The numbers of the texts of one table.

    An index that was empty holds no text that this run did not write, so nothing need be looked up in it.
    """

    def __init__(self, connection: sqlite3.Connection, table: str, column: str, *, empty: bool) -> None:
        self._connection = connection
        self._select = f"SELECT id FROM {table} WHERE {column} = ?"
        self._with_tail = table == "names"
        self._insert = f"INSERT INTO {table} VALUES (?, ?{', ?' if self._with_tail else ''})"
        self._empty = empty
        self._numbers = {"": 0}
        self._next: int = connection.execute(f"SELECT max(id) FROM {table}").fetchone()[0] + 1

    def numbers_of(self, texts: list[str]) -> list[int]:
        """A number for each text; the table gets those that it does not have."""
        numbers = self._numbers
        unknown = [text for text in texts if text not in numbers]
        if unknown:
            self._learn(unknown)
        return list(map(numbers.__getitem__, texts))

    def _learn(self, texts: list[str]) -> None:
        if not self._empty:
            for text in texts:
                row = self._connection.execute(self._select, (text,)).fetchone()
                if row is not None:
                    self._numbers[text] = row[0]
        new = dict.fromkeys(text for text in texts if text not in self._numbers)
        numbered = list(enumerate(new, self._next))
        self._next += len(numbered)
        self._numbers.update((text, number) for number, text in numbered)
        rows = [(number, text, tail_of(text)) for number, text in numbered] if self._with_tail else numbered
        self._connection.executemany(self._insert, rows)
