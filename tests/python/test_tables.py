"""The records of files as pages of a database: whole for SQLite, and with the rows that an analysis gives."""

from __future__ import annotations

import os
import sqlite3
from contextlib import closing
from pathlib import Path

import pytest

from indexing import SHOP
from quillet import analyze_files
from quillet._languages import decode_source, native_language_of
from quillet.index.tables import Source, make_tables, write_sqlite
from quillet.tarvex import _host

VERSION = (3, 12)


def write(folder: Path, *sources: bytes) -> sqlite3.Connection:
    """The tables of files with these sources."""
    paths = []
    for number, source in enumerate(sources):
        path = folder / f"file{number:03}.py"
        path.write_bytes(source)
        paths.append(str(path))
    target = str(folder / "t.sqlite")
    outcome = write_sqlite(Source(paths, [os.fsencode(path) for path in paths], VERSION), target)
    assert outcome.files == len(sources)
    connection = sqlite3.connect(target)
    assert connection.execute("PRAGMA integrity_check").fetchall() == [("ok",)]
    assert connection.execute("SELECT count(*) FROM records").fetchone() == (outcome.records,)
    return connection


def expected_rows(*sources: bytes) -> list[tuple[object, ...]]:
    results = analyze_files([(f"{number}.py", source) for number, source in enumerate(sources)], version=VERSION)
    return [(result.path, *row) for result in results for row in result.records.plain()]


def assert_holds(connection: sqlite3.Connection, *sources: bytes) -> None:
    expected = expected_rows(*sources)
    found = connection.execute(
        "SELECT ((r.id >> 24) - 1) || '.py', line, column, s.name, n.name, k.kind, d.detail, is_parameter"
        " FROM records r JOIN names n ON n.id = r.name JOIN names s ON s.id = r.scope"
        " JOIN kinds k ON k.id = r.kind JOIN details d ON d.id = r.detail ORDER BY r.id"
    )
    assert found.fetchall() == expected
    # By the index, which has the order of names and scopes.
    keys = "SELECT name, scope, id FROM records INDEXED BY records_by_name WHERE name >= 0 ORDER BY name, scope, id"
    plan = " ".join(row[3] for row in connection.execute(f"EXPLAIN QUERY PLAN {keys}"))
    assert "COVERING INDEX records_by_name" in plan
    assert "TEMP B-TREE" not in plan
    rows = connection.execute(keys).fetchall()
    assert len(rows) == len(expected)
    assert rows == sorted(connection.execute("SELECT name, scope, id FROM records NOT INDEXED"))


# From no page to trees of three levels.
@pytest.mark.parametrize("lines", [0, 1, 80, 250, 3_000, 60_000])
def test_the_database_is_whole_at_every_size(tmp_path: Path, lines: int) -> None:
    source = b"".join(b"name%d.part = f(%d)\n" % (line % 977, line % 1013) for line in range(lines))
    with closing(write(tmp_path, source)) as connection:
        assert_holds(connection, source)


def test_rows_are_those_of_an_analysis(tmp_path: Path) -> None:
    sources = [SHOP.encode(), b"", b"x = = 1\ny = 2\n", b"# coding: nothing-such\n", SHOP.encode() * 40]
    with closing(write(tmp_path, *sources)) as connection:
        assert_holds(connection, *sources)
        opens = connection.execute(
            "SELECT n.name, opens FROM records r JOIN names n ON n.id = r.name WHERE opens > 0 AND r.id >> 24 = 1"
        ).fetchall()
        assert opens == [("Item", 1), ("__init__", 2), ("Shop", 1), ("add", 2), ("path", 2), ("main", 2)]
        assert connection.execute("SELECT id, lines > 0, problem IS NULL FROM files").fetchall() == [
            (1, 1, 1),
            (2, 0, 1),
            (3, 1, 1),
            (4, 0, 0),
            (5, 1, 1),
        ]


def test_texts_that_are_shown_alike_are_one(tmp_path: Path) -> None:
    # A byte that is no character, and the escape by which it is shown.
    sources = [b"x: '\xff' = '\xff'\n", b"x: '\\xff' = '\\xff'\n", "é: 'ü'\n".encode()]
    with closing(write(tmp_path, *sources)) as connection:
        assert_holds(connection, *sources)
        assert connection.execute("SELECT count(*) FROM details WHERE detail = '\\xff'").fetchone() == (1,)


# ---- what the host may do ----


def empty_database(path: Path) -> bytearray:
    with closing(sqlite3.connect(path)) as connection:
        make_tables(connection)
    return bytearray(path.read_bytes()[:100])


def analysed(source: bytes) -> _host.FileResult:
    batch = _host.Batch(native_language_of(VERSION), [(b"a.py", source, None)], 1, decode_source, None, False)
    result = batch.Next()
    assert result is not None
    return result


def test_no_page_is_where_sqlite_locks(tmp_path: Path) -> None:
    head = empty_database(tmp_path / "empty.sqlite")
    size = int.from_bytes(head[16:18], "big")
    locked = (1 << 30) // size + 1
    head[28:32] = (locked - 2).to_bytes(4, "big")
    rows = _host.RecordRows(bytes(head))
    rows.Add(analysed(b"name = other\n" * 300), 1)
    root = rows.FinishTable()
    pages = rows.Take()
    assert rows.page_count == locked - 2 + len(pages) // size
    assert pages[size : 2 * size] == bytes(size)
    assert pages[0] == pages[2 * size] == 13
    children = [root[int.from_bytes(root[12 + 2 * cell : 14 + 2 * cell], "big") :][:4] for cell in range(2)]
    assert [int.from_bytes(child, "big") for child in children] == [locked - 1, locked + 1]


def test_heads_that_take_no_pages_are_refused(tmp_path: Path) -> None:
    head = empty_database(tmp_path / "empty.sqlite")
    for place, byte in ((0, 0), (20, 8), (47, 1), (16, 0)):
        other = bytearray(head)
        other[place] = byte
        with pytest.raises(ValueError, match="SQLite database"):
            _host.RecordRows(bytes(other))
    with pytest.raises(ValueError, match="SQLite database"):
        _host.RecordRows(bytes(head[:99]))


def test_ended_tables_take_nothing(tmp_path: Path) -> None:
    rows = _host.RecordRows(bytes(empty_database(tmp_path / "empty.sqlite")))
    result = analysed(b"name = other\n")
    rows.Add(result, 1 << 24)
    with pytest.raises(ValueError, match="next row"):
        rows.Add(result, 1 << 24)
    with pytest.raises(ValueError, match="next row"):
        rows.Add(result, 1 << 56)
    rows.FinishTable()
    with pytest.raises(ValueError, match="next row"):
        rows.Add(result, 2 << 24)
    with pytest.raises(ValueError, match="ended"):
        rows.FinishTable()
    rows.FinishIndex()
    with pytest.raises(ValueError, match="next row"):
        rows.AddToIndex()
    with pytest.raises(ValueError, match="ended"):
        rows.FinishIndex()
