"""Record batches of sources to record batches of what they say: layouts, columns, errors, bounds."""

from __future__ import annotations

import subprocess
import sys
import threading
from collections.abc import Iterable
from typing import Any

import pytest

import quillet
from quillet import corpus

pyarrow = pytest.importorskip("pyarrow")
pytest.importorskip("pyarrow.compute")

SHOP = b"""\
class Shop:
    def total(self, price, tax=1):
        return price * tax
"""
BROKEN = b"def f(:\n    x = 1\n"
SOURCES = [("shop.py", SHOP), ("broken.py", BROKEN), ("empty.py", b"")]

TEXT_TYPES = {
    "string": pyarrow.string(),
    "large_string": pyarrow.large_string(),
    "string_view": pyarrow.string_view(),
    "dictionary of strings": pyarrow.dictionary(pyarrow.int8(), pyarrow.string()),
}
BYTES_TYPES = {
    "binary": pyarrow.binary(),
    "large_binary": pyarrow.large_binary(),
    "binary_view": pyarrow.binary_view(),
    "dictionary of binary": pyarrow.dictionary(pyarrow.int32(), pyarrow.large_binary()),
}


def batch_of(sources: Iterable[tuple[str, Any]], content: Any = None, **columns: Any) -> Any:
    paths, contents = zip(*sources, strict=True)
    arrays = {"path": pyarrow.array(paths), "content": pyarrow.array(contents, content or pyarrow.binary())}
    return pyarrow.record_batch({**arrays, **columns})


def table_of(batches: Iterable[Any]) -> Any:
    return pyarrow.Table.from_batches(list(batches))


def expected_rows(sources: Iterable[tuple[str, bytes]], version: tuple[int, int] | None = None) -> list[tuple]:
    """What `analyze_files` says of the sources, in the columns of the corpus."""
    rows = []
    for result in quillet.analyze_files(list(sources), version=version):
        rows += [(result.path, *row, None) for row in result.records.plain()]
        rows += [(result.path, line, column, "", "", "error", "", False, text) for line, column, text in result.errors]
    return rows


def rows_of(table: Any) -> list[tuple]:
    return [tuple(row.values()) for row in table.to_pylist()]


# ---- what comes out ----


def test_records_are_those_of_analyze_files() -> None:
    table = table_of(corpus.records([batch_of(SOURCES)]))
    assert rows_of(table) == expected_rows(SOURCES)


def test_the_schema_is_the_documented_one() -> None:
    for form, batches in {
        "records": corpus.records([batch_of(SOURCES)]),
        "occurrences": corpus.records([batch_of(SOURCES)], occurrences=True),
        "files": corpus.files([batch_of(SOURCES)]),
    }.items():
        found = [(field.name, str(field.type), field.nullable) for field in table_of(batches).schema]
        assert found == corpus.schema(form)
        assert {kind for _, kind, _ in found} <= {"int32", "int64", "string", "bool"}


def test_occurrences_are_those_of_analyze_files() -> None:
    table = table_of(corpus.records([batch_of(SOURCES)], occurrences=True))
    expected = pyarrow.table(quillet.analyze_files(SOURCES, bindings=True).occurrences)
    found = table.filter(pyarrow.compute.is_null(table["error"]))
    assert found.num_rows == expected.num_rows > 0
    for name in expected.column_names:
        assert found[name].to_pylist() == expected[name].to_pylist(), name
    [error] = table.filter(pyarrow.compute.is_valid(table["error"])).to_pylist()
    assert (error["path"], error["index"], error["line"], error["role"]) == ("broken.py", -1, 1, "error")


def test_files_are_counted() -> None:
    table = table_of(corpus.files([batch_of([*SOURCES, ("odd.py", b"# coding: klingon\n"), ("null.py", None)])]))
    assert table.drop_columns(["python", "problem"]).to_pylist() == [
        {"path": "shop.py", "bytes": len(SHOP), "lines": 3, "statements": 3, "errors": 0},
        {"path": "broken.py", "bytes": len(BROKEN), "lines": 2, "statements": 1, "errors": 1},
        {"path": "empty.py", "bytes": 0, "lines": 0, "statements": 0, "errors": 0},
        {"path": "odd.py", "bytes": 18, "lines": 0, "statements": 0, "errors": 0},
        {"path": "null.py", "bytes": 0, "lines": 0, "statements": 0, "errors": 0},
    ]
    assert table["problem"].to_pylist() == [
        None,
        None,
        None,
        "cannot read the source as 'klingon': unknown encoding: klingon",
        "there is no source",
    ]


def test_what_cannot_be_read_is_a_row() -> None:
    batch = batch_of([("odd.py", b"# coding: klingon\nx = 1\n"), ("null.py", None), ("shop.py", SHOP)])
    rows = [row for row in table_of(corpus.records([batch])).to_pylist() if row["error"] is not None]
    assert [(row["path"], row["kind"], row["line"], row["error"]) for row in rows] == [
        ("odd.py", "problem", 1, "cannot read the source as 'klingon': unknown encoding: klingon"),
        ("null.py", "problem", 1, "there is no source"),
    ]


# ---- what goes in ----


@pytest.mark.parametrize("name", [*TEXT_TYPES, *BYTES_TYPES])
@pytest.mark.parametrize("cut", [slice(None), slice(1, None)])
def test_content_of_any_layout(name: str, cut: slice) -> None:
    kind = {**TEXT_TYPES, **BYTES_TYPES}[name]
    contents = [source.decode() if name in TEXT_TYPES else source for _, source in SOURCES]
    storage = kind.value_type if pyarrow.types.is_dictionary(kind) else kind
    array = pyarrow.array(contents, storage)
    batch = pyarrow.record_batch(
        {
            "path": pyarrow.array([path for path, _ in SOURCES]).dictionary_encode(),
            "content": array.dictionary_encode().cast(kind) if kind is not storage else array,
        }
    )[cut]
    assert rows_of(table_of(corpus.records([batch]))) == expected_rows(SOURCES[cut])


def test_strings_are_taken_as_they_are_and_bytes_decoded() -> None:
    source = "# coding: latin-1\ns = 'é'\n"
    expected = [("s", "str: 'é'")]
    for content, kind in ((source, pyarrow.string()), (source.encode("latin-1"), pyarrow.binary())):
        table = table_of(corpus.records([batch_of([("a.py", content)], kind)]))
        assert [(row["name"], row["detail"]) for row in table.to_pylist() if row["detail"]] == expected


def test_columns_are_carried_along() -> None:
    from datetime import date, datetime
    from decimal import Decimal

    kept = {
        "package": pyarrow.array(["one", None, "two"], pyarrow.large_string()),
        "raw": pyarrow.array([b"\xff", b"", None], pyarrow.binary_view()),
        "number": pyarrow.array([2**63, None, 3], pyarrow.uint64()),
        "small": pyarrow.array([-1, 0, 1], pyarrow.int8()),
        "share": pyarrow.array([0.5, None, 2.5], pyarrow.float32()),
        "price": pyarrow.array([Decimal("1.25"), None, Decimal("2.50")], pyarrow.decimal128(9, 2)),
        "day": pyarrow.array([date(2020, 1, 2), None, date(1970, 1, 1)], pyarrow.date32()),
        "moment": pyarrow.array([datetime(2020, 1, 2), None, datetime(1970, 1, 1)], pyarrow.timestamp("us", "UTC")),
        "flag": pyarrow.array([True, None, False]),
        "nothing": pyarrow.nulls(3),
    }
    batch = batch_of([*SOURCES[:2], ("last.py", b"x = 1\n")], **kept)
    whole = table_of(corpus.records([batch, batch[2:]], keep=list(kept)))
    assert whole.column_names[:-9] == [*kept, "path"][:-1]
    values = {row["path"]: row for row in batch.drop_columns(["content"]).to_pylist()}
    for row in whole.to_pylist():
        assert {name: row[name] for name in [*kept, "path"]} == values[row["path"]]
    assert [row["path"] for row in whole.to_pylist()].count("last.py") == 4
    for name, array in kept.items():
        kind = whole.schema.field(name).type
        assert kind == {"package": pyarrow.string(), "raw": pyarrow.binary(), "nothing": pyarrow.string()}.get(
            name, array.type
        )


def test_columns_have_the_names_that_they_are_given() -> None:
    batch = pyarrow.record_batch({"file": [b"odd\xff.py"], "text": ["x = 1\n"]})
    table = table_of(corpus.records([batch], path="file", content="text"))
    assert set(table["path"].to_pylist()) == {"odd\\xff.py"}
    assert table.num_rows == 2


@pytest.mark.parametrize(
    ("arguments", "error", "text"),
    [
        ({"path": "file"}, ValueError, "there is no column 'file'; there are: path, content, n, list, line"),
        ({"content": "n"}, TypeError, "column 'n' must hold strings or bytes"),
        ({"keep": ["list"]}, TypeError, "column 'list' is of a type that is not read here"),
        ({"keep": ["line"]}, ValueError, "column 'line' cannot be kept"),
        ({"keep": "n"}, TypeError, "keep is a sequence of names"),
        ({"version": "automatic"}, ValueError, "version must be a tuple"),
        ({"version": (4, 0)}, ValueError, "version must be"),
    ],
)
def test_wrong_arguments_are_told(arguments: dict[str, Any], error: type[Exception], text: str) -> None:
    batch = batch_of([("a.py", b"x = 1\n")], n=pyarrow.array([1]), list=pyarrow.array([[1]]), line=pyarrow.array([1]))
    with pytest.raises(error, match=text.replace("(", r"\(")):
        list(corpus.records([batch], **arguments))


def test_what_is_no_batch_is_told() -> None:
    with pytest.raises(TypeError, match="a record batch of Arrow is needed, not int"):
        list(corpus.records([3]))
    with pytest.raises(TypeError, match="a record batch is needed"):
        list(corpus.records([pyarrow.array([1])]))


def test_a_column_that_changes_its_type_is_told() -> None:
    first = batch_of([("a.py", b"x = 1\n")], n=pyarrow.array([1]))
    second = batch_of([("a.py", b"x = 1\n")], n=pyarrow.array(["1"]))
    with pytest.raises(TypeError, match="column 'n' has another type than in the batches before"):
        list(corpus.records([first, second], keep=["n"]))


# ---- how it runs ----


def test_it_reads_as_it_goes_and_gives_batches_of_moderate_size() -> None:
    read = []
    source = b"a.b = c(d)\n" * 20_000

    def batches() -> Iterable[Any]:
        for number in range(8):
            read.append(number)
            yield batch_of([(f"{number}.py", source)])

    found = corpus.records(batches())
    first = next(found)
    assert read == [0]
    rest = list(found)
    assert max(batch.num_rows for batch in [first, *rest]) <= 65_536
    assert rows_of(table_of([first, *rest])) == expected_rows((f"{number}.py", source) for number in range(8))


def test_small_batches_are_put_together() -> None:
    batches = [batch_of([(f"{number}.py", b"x = 1\n")]) for number in range(100)]
    [table] = corpus.records(batches)
    assert table.num_rows == 200


def test_nothing_gives_nothing() -> None:
    assert list(corpus.records([])) == []
    assert list(corpus.records([batch_of([("a.py", b"")])])) == []
    [files] = corpus.files([batch_of([("a.py", b"")])])
    assert files.num_rows == 1


def test_a_file_that_fails_half_way_leaves_no_rows() -> None:
    # Texts that overlap pass the bound of memory only once there are many of them.
    deep = b"x = " + b"(" * 100_000
    table = table_of(corpus.records([batch_of([("a.py", SHOP), ("deep.py", deep), ("b.py", SHOP)])]))
    counts = {row["values"]: row["counts"] for row in table["path"].value_counts().to_pylist()}
    assert counts["a.py"] == counts["b.py"]
    assert {row["kind"] for row in table.to_pylist() if row["path"] == "deep.py"} <= {"error", "problem", "report"}


def test_other_readers_than_pyarrow() -> None:
    polars = pytest.importorskip("polars")
    frame = polars.DataFrame({"path": [path for path, _ in SOURCES], "content": [text for _, text in SOURCES]})
    batches = list(corpus.records(frame))
    assert {type(batch) for batch in batches} == {corpus.RecordBatch}
    assert polars.concat([polars.DataFrame(batch) for batch in batches]).rows() == expected_rows(SOURCES)


def test_neither_pyarrow_nor_anything_else_is_imported() -> None:
    code = "import quillet.corpus, sys; print(sorted({'pyarrow', 'pandas', 'numpy'} & set(sys.modules)))"
    assert subprocess.run([sys.executable, "-c", code], capture_output=True, text=True, check=True).stdout == "[]\n"


@pytest.mark.parametrize("reader", ["duckdb", "polars", "pandas"])
def test_readers_take_it_without_a_cast(reader: str) -> None:
    module = pytest.importorskip(reader)
    table = table_of(corpus.records([batch_of(SOURCES)]))
    if reader == "duckdb":
        assert module.from_arrow(table).fetchall() == expected_rows(SOURCES)
    elif reader == "polars":
        assert module.from_arrow(table).rows() == expected_rows(SOURCES)
    else:
        assert [tuple(row)[:8] for row in table.to_pandas().values.tolist()] == [
            row[:8] for row in expected_rows(SOURCES)
        ]


def test_two_threads_may_not_share_one_stream() -> None:
    source = b"a.b = c(d)\n" * 50_000
    found = corpus.records([batch_of([(f"{n}.py", source)]) for n in range(4)])
    failures: list[str] = []
    counts: list[int] = []

    def read() -> None:
        try:
            counts.extend(batch.num_rows for batch in found)
        except ValueError as error:
            failures.append(str(error))

    threads = [threading.Thread(target=read) for _ in range(2)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert len(failures) <= 1
    assert sum(counts) == len(expected_rows((f"{n}.py", source) for n in range(4)))


# ---- versions ----


@pytest.mark.parametrize(
    ("source", "python"),
    [
        (b"x = 1\n", "3.13"),
        (b"print 'x'\n", "2.7"),
        (b"try:\n    pass\nexcept E, e:\n    pass\n", "2.7"),
        (b"def f(x: int): pass\n", "3.13"),
        (b"async = 1\n", "3.6"),
        (b"def f(x: int, async=1): pass\n", "3.6"),
        (b"#!/usr/bin/env python2\nprint(1)\n", "2.7"),
        (b"#!/usr/bin/python2\ndef f(x: int): pass\n", "3.13"),
        (b"def f(:\n", "3.13"),
    ],
)
def test_a_source_shows_its_version(source: bytes, python: str) -> None:
    table = table_of(corpus.files([batch_of([("a.py", source)])], version="auto"))
    assert table["python"].to_pylist() == [python]


def test_records_are_those_of_the_version_that_a_source_shows() -> None:
    sources = [("2.py", b"print x\nexec y\n"), ("3.py", b"def f(x: int): pass\n")]
    table = table_of(corpus.records([batch_of(sources)], version="auto"))
    expected = expected_rows(sources[:1], (2, 7)) + expected_rows(sources[1:], (3, 13))
    assert rows_of(table) == expected
