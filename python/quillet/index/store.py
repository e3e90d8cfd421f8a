"""The file of an index: its tables, how it is opened, and who may write it.

SQLite in WAL mode, so that questions are answered while a run writes. A run commits file by file in
batches, and each file's rows go and come in one transaction: whatever moment a run ends at, the index is
what it was after some of its files. One run writes at a time, by a lock on a file beside the index that
the system drops with the process. The trap: the number of a record holds its file's, so that a file's
records lie together and go by one range, without an index on the file.
"""

from __future__ import annotations

import os
import sqlite3
import sys
from collections.abc import Callable, Iterator
from contextlib import contextmanager

APPLICATION_ID = 0x51554C54  # "QULT"
SCHEMA = 1
DEFAULT_NAME = ".quillet-index"
# A record's number is its file's number, shifted, and its place in the file.
FILE_SHIFT = 24
MAX_RECORDS = 1 << FILE_SHIFT

# The kinds of records by their number in the index. `quillet.RecordKind` has the same values; they stand
# here again so that a question does not load the engine.
KINDS = (
    "set",
    "get",
    "within_expr",
    "called",
    "import",
    "from_import",
    "import_as",
    "global",
    "nonlocal",
    "type_parameter",
    "expression",
    "literal",
    "hint",
    "instance",
    "equal",
    "other",
)
# What a record's name opens a scope for, if any.
CLASS = 1
FUNCTION = 2
KIND_NUMBER = {kind: number for number, kind in enumerate(KINDS)}

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
# A first run makes these last, when all rows can be sorted at once; they stay from then on.
INDICES = (
    "CREATE UNIQUE INDEX IF NOT EXISTS names_by_name ON names (name)",
    "CREATE INDEX IF NOT EXISTS names_by_tail ON names (tail)",
    "CREATE UNIQUE INDEX IF NOT EXISTS details_by_detail ON details (detail)",
    "CREATE INDEX IF NOT EXISTS records_by_name ON records (name, scope)",
)
RECORD_COLUMNS = 9


class IndexProblem(Exception):
    """An index that cannot be used; the text says why and what to do."""


def tail_of(name: str) -> str:
    """What stands behind the last dot, by which names are found from their end."""
    return name.rpartition(".")[2]


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


def open_to_read(path: str) -> sqlite3.Connection:
    """An index to ask. Raises `IndexProblem`."""
    if not os.path.isfile(path):
        raise IndexProblem(f"{path}: there is no such index; make it with: quillet index . -o {path}")
    with explained(path):
        _check_header(path)
        connection = sqlite3.connect(path, isolation_level=None, timeout=30)
        try:
            connection.execute("PRAGMA query_only=1")
            _check_schema(path, connection)
        except BaseException:
            connection.close()
            raise
    return connection


def open_to_write(path: str) -> sqlite3.Connection:
    """An index to bring up to date, made where there is none. The caller holds the lock. Raises `IndexProblem`."""
    folder = os.path.dirname(os.path.abspath(path))
    if not os.path.isdir(folder):
        raise IndexProblem(f"{path}: there is no folder {folder} to hold the index")
    if os.path.isdir(path):
        raise IndexProblem(f"{path}: is a folder; name a file with -o")
    with explained(path):
        if os.path.exists(path):
            _check_header(path)
        connection = sqlite3.connect(path, isolation_level=None, timeout=30)
        try:
            empty = not connection.execute("SELECT 1 FROM sqlite_master LIMIT 1").fetchone()
            if empty and connection.execute("PRAGMA application_id").fetchone()[0] == 0:
                _create(connection)
            _check_schema(path, connection)
            connection.execute("PRAGMA journal_mode=WAL")
            connection.execute("PRAGMA synchronous=NORMAL")
            connection.execute("PRAGMA cache_size=-65536")
        except BaseException:
            connection.close()
            raise
    return connection


@contextmanager
def explained(path: str) -> Iterator[None]:
    """Turns what SQLite and the system say of a bad file into an `IndexProblem` that says what to do."""
    try:
        yield
    except sqlite3.OperationalError as error:
        raise IndexProblem(f"{path}: {error}; check that it can be written, and the space on the disk") from error
    except sqlite3.DatabaseError as error:
        raise IndexProblem(f"{path}: the index is damaged ({error}); delete it and run: quillet index") from error
    except OSError as error:
        raise IndexProblem(f"{path}: {error.strerror or error}") from error


@contextmanager
def write_lock(path: str, waiting: Callable[[], None]) -> Iterator[None]:
    """Waits until no other run writes the index; `waiting` is called once where there is one.

    The lock is on a file beside the index, which stays: to delete it would give two runs a lock each.
    """
    with explained(path):
        file = os.open(path + ".lock", os.O_RDWR | os.O_CREAT, 0o666)
    try:
        if not _try_lock(file):
            waiting()
            _wait_for_lock(file)
        yield
    finally:
        os.close(file)


if sys.platform == "win32":
    import msvcrt
    import time

    def _try_lock(file: int) -> bool:
        try:
            msvcrt.locking(file, msvcrt.LK_NBLCK, 1)
        except OSError:
            return False
        return True

    def _wait_for_lock(file: int) -> None:
        while not _try_lock(file):
            time.sleep(0.05)

else:
    import fcntl

    def _try_lock(file: int) -> bool:
        try:
            fcntl.flock(file, fcntl.LOCK_EX | fcntl.LOCK_NB)
        except BlockingIOError:
            return False
        return True

    def _wait_for_lock(file: int) -> None:
        fcntl.flock(file, fcntl.LOCK_EX)


def _foreign(path: str) -> IndexProblem:
    return IndexProblem(f"{path}: is no index of quillet; name another file with -o, or delete this one")


def _check_header(path: str) -> None:
    """Looks at the first bytes before SQLite does: it would take any empty or short file as its own."""
    with open(path, "rb") as file:
        head = file.read(72)
    if head and (len(head) < 72 or not head.startswith(b"SQLite format 3\0")):
        raise _foreign(path)
    if head and int.from_bytes(head[68:72], "big") not in (0, APPLICATION_ID):
        raise _foreign(path)


def _check_schema(path: str, connection: sqlite3.Connection) -> None:
    if connection.execute("PRAGMA application_id").fetchone()[0] != APPLICATION_ID:
        raise _foreign(path)
    schema = connection.execute("PRAGMA user_version").fetchone()[0]
    if schema != SCHEMA:
        raise IndexProblem(f"{path}: was made by another version of quillet; delete it and run: quillet index")


def _create(connection: sqlite3.Connection) -> None:
    # One transaction, so that a run that ends here leaves an empty file, which the next one takes.
    script = f"BEGIN IMMEDIATE; {_TABLES} PRAGMA application_id={APPLICATION_ID}; PRAGMA user_version={SCHEMA};"
    connection.executescript(script)
    connection.executemany("INSERT INTO kinds VALUES (?, ?)", enumerate(KINDS))
    connection.execute("INSERT INTO names VALUES (0, '', '')")
    connection.execute("INSERT INTO details VALUES (0, '')")
    connection.execute("COMMIT")
