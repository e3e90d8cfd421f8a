"""Many files at once: what `analyze_files` gives, to Python and to readers of columns, and how it ends."""

from __future__ import annotations

import os
import pickle
import random
import re
import signal
import subprocess
import sys
import threading
import time
from collections import Counter
from collections.abc import Callable, Iterator
from pathlib import Path

import pytest

import quillet
from quillet import FileRecord, RecordKind, analyze, analyze_files
from quillet._records import describe
from quillet.tarvex import _host

STDLIB = Path(os.__file__).parent
SHOP = b"""\
class Shop:
    def total(self, price, tax=1):
        # type: (int, float) -> float
        global count
        count = price.value
        def add(n):
            nonlocal tax
            tax = n
        return add
"""


def shop_records(name: str) -> list[FileRecord]:
    [result] = analyze_files([("shop.py", SHOP)], version=(3, 12))
    return [record for record in result.records if record.name == name]


# ---- records ----


def test_records_have_their_place_and_scope() -> None:
    assert shop_records("price.value") == [
        FileRecord(5, 17, "Shop.total", "price.value", RecordKind.GET, "", False),
    ]
    assert [(r.line, r.scope, r.kind.value) for r in shop_records("count")] == [
        (4, "Shop.total", "global"),
        (5, "", "set"),
        (5, "", "equal"),
    ]
    assert [(r.line, r.scope) for r in shop_records("tax") if r.line > 6] == [
        (7, "Shop.total.add"),
        (8, "Shop.total"),
        (8, "Shop.total"),
    ]
    assert [(r.line, r.detail, r.is_parameter) for r in shop_records("price") if r.kind is RecordKind.HINT] == [
        (3, "int", True)
    ]


def test_records_are_a_sequence() -> None:
    [result] = analyze_files([("shop.py", SHOP)])
    records = result.records
    assert records[0].name == "Shop"
    assert records[-1] == list(records)[-1]
    assert records[1:4] == list(records)[1:4]
    assert records[::-2] == list(records)[::-2]
    with pytest.raises(IndexError):
        records[len(records)]
    assert records.plain() == [(*record[:4], record.kind.value, *record[5:]) for record in records]
    assert {type(row) for row in records.plain()} == {tuple}


def test_kinds_are_those_of_single_sources() -> None:
    assert tuple(kind.value for kind in RecordKind) == _host.RECORD_KIND_WORDS


def test_definitions_have_their_extent() -> None:
    [result] = analyze_files([("shop.py", SHOP)])
    assert result.definitions == [
        ("Shop", "class", 1, 7, 1, 9),
        ("Shop.total", "def", 2, 9, 2, 9),
        ("Shop.total.add", "def", 6, 13, 6, 8),
    ]


def test_files_say_what_single_sources_say() -> None:
    # Signature comments on a line of their own are joined to their function here alone.
    paths = sorted((STDLIB / "json").glob("*.py")) + sorted((STDLIB / "email").glob("*.py"))
    for result in analyze_files(paths, version=(3, 11)):
        single = analyze(Path(result.path).read_bytes(), version=(3, 11))
        expected = [record for line in single.lines for record in line.records]
        assert [(r.name, r.kind, r.detail, r.is_parameter) for r in result.records] == expected
        source = Path(result.path).read_bytes().splitlines()
        for record in result.records:
            first = re.split(r"[.(\[]", record.name)[0]
            if record.kind is RecordKind.GET and first.isidentifier():
                assert source[record.line - 1][record.column - 1 :].startswith(first.encode()), record


# ---- files ----


def test_results_come_in_order_whatever_the_threads() -> None:
    paths = sorted(STDLIB.glob("*.py"))[:60]
    seen = []
    for jobs in (1, 2, 5):
        results = list(analyze_files(paths, version=(3, 11), jobs=jobs))
        assert [result.path for result in results] == [str(path) for path in paths]
        seen.append([(r.lines, r.statements, r.errors, r.records.plain()) for r in results])
    assert seen[0] == seen[1] == seen[2]


def test_what_cannot_be_read_is_a_result(tmp_path: Path) -> None:
    good = tmp_path / "good.py"
    good.write_bytes(b"x = = 1\ny\n")
    odd = tmp_path / "odd.py"
    odd.write_bytes(b"# coding: no-such\n")
    results = list(analyze_files([tmp_path / "gone.py", tmp_path, odd, good, "a\0b"]))
    assert [result.problem for result in results] == [
        "No such file or directory",
        "Is a directory",
        "cannot read the source as 'no-such': unknown encoding: no-such",
        None,
        "embedded null byte",
    ]
    assert results[3].errors == [(1, 5, "invalid syntax")]
    assert (results[3].lines, results[3].statements, results[3].size) == (2, 2, 10)
    assert len(results[0].records) == 0


def test_other_encodings_are_decoded(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_bytes("# coding: latin-1\né = 'ü'\n".encode("latin-1"))
    wide = tmp_path / "b.py"
    wide.write_bytes("é = 'ü'\n".encode("utf-16"))
    for result in analyze_files([path, wide]):
        assert [(r.name, r.detail) for r in result.records] == [("é", ""), ("é", "str: 'ü'")]


def test_odd_file_names_pass(tmp_path: Path) -> None:
    path = os.fsencode(tmp_path) + b"/a\n'\"\xff.py"
    Path(os.fsdecode(path)).write_text("x\n")
    [result] = analyze_files([path])
    assert (os.fsencode(result.path), result.problem, len(result.records)) == (path, None, 1)


def test_a_walk_that_meets_its_limit_is_told_with_its_file(capfd: pytest.CaptureFixture[str]) -> None:
    deep = b"y\nx = " + b"a + " * 20_000 + b"a\n"
    results = list(analyze_files([("a.py", b"x\n"), ("deep.py", deep)], jobs=2, exact=True))
    assert results[0].reports == []
    [(line, _, message)] = results[1].reports
    assert line == 2
    assert message == "too long to be read whole; its records may be incomplete"
    assert capfd.readouterr() == ("", "")


def test_wrong_arguments_are_refused_at_once() -> None:
    with pytest.raises(TypeError):
        analyze_files([1])  # type: ignore[list-item]
    with pytest.raises(TypeError):
        analyze_files([("a.py", 3)])  # type: ignore[list-item]
    with pytest.raises(TypeError):
        analyze_files([], jobs="2")  # type: ignore[arg-type]
    with pytest.raises(ValueError, match="jobs"):
        analyze_files([], jobs=0)
    with pytest.raises(ValueError, match="version"):
        analyze_files([], version=(4, 0))


# ---- how it ends ----


def test_closing_ends_it() -> None:
    with analyze_files([("a.py", b"x\n")] * 1000, jobs=2) as results:
        assert next(results).path == "a.py"
    assert list(results) == []


def test_dropping_it_half_way_leaves_no_thread() -> None:
    def thread_count() -> int:
        return len(os.listdir("/proc/self/task")) if os.path.exists("/proc/self/task") else 0

    before = thread_count()
    results = analyze_files([("a.py", SHOP)] * 1000, jobs=4)
    next(results)
    del results
    # The system lists a thread for a moment longer than it can be joined.
    deadline = time.monotonic() + 10
    while thread_count() != before and time.monotonic() < deadline:
        time.sleep(0.01)
    assert thread_count() == before


def test_several_threads_may_read_one_batch() -> None:
    results = analyze_files([(f"{i}.py", SHOP) for i in range(300)], jobs=2)
    seen: list[str] = []

    def read() -> None:
        for result in results:
            seen.append(result.path)

    threads = [threading.Thread(target=read) for _ in range(4)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert sorted(seen) == sorted(f"{i}.py" for i in range(300))


@pytest.mark.skipif(not hasattr(os, "mkfifo"), reason="needs pipes with names")
def test_an_interrupt_ends_the_wait_for_a_pipe(tmp_path: Path) -> None:
    pipe = tmp_path / "pipe.py"
    os.mkfifo(pipe)
    code = "import sys, quillet\nprint('ready', flush=True)\nnext(quillet.analyze_files([sys.argv[1]]))"
    with subprocess.Popen(
        [sys.executable, "-c", code, str(pipe)], stdout=subprocess.PIPE, stderr=subprocess.PIPE
    ) as process:
        assert process.stdout is not None
        assert process.stderr is not None
        process.stdout.readline()
        for _ in range(50):
            process.send_signal(signal.SIGINT)
            try:
                process.wait(timeout=1)
                break
            except subprocess.TimeoutExpired:
                continue
        assert b"KeyboardInterrupt" in process.stderr.read()


# ---- sources of any kind ----


@pytest.mark.parametrize("kind", [bytes, bytearray, memoryview, bytes.decode])
def test_sources_are_buffers_or_text(kind: Callable[[bytes], object]) -> None:
    [expected] = analyze_files([("shop.py", SHOP)])
    [result] = analyze_files([("shop.py", kind(SHOP))])
    assert list(result.records) == list(expected.records)
    assert result.size == len(SHOP)


def test_text_is_taken_as_it_is_whatever_encoding_it_names() -> None:
    [result] = analyze_files([("a.py", "# coding: klingon\ns = 'é'\n")])
    assert result.problem is None
    assert [record.detail for record in result.records if record.detail] == ["str: 'é'"]
    [result] = analyze_files([("a.py", bytearray(b"# coding: latin-1\ns = '\xe9'\n"))])
    assert [record.detail for record in result.records if record.detail] == ["str: 'é'"]


def test_a_part_of_a_buffer_is_a_source() -> None:
    [result] = analyze_files([("a.py", memoryview(b"xx = 1\nyy = 2\n")[7:])])
    assert [record.name for record in result.records] == ["yy", "yy"]


def test_a_generator_is_read_as_results_are_asked_for() -> None:
    read = []

    def sources() -> Iterator[tuple[str, bytes]]:
        for number in range(1000):
            read.append(number)
            yield f"{number}.py", SHOP

    results = analyze_files(sources(), jobs=2)
    assert read == []
    assert next(results).path == "0.py"
    assert 1 <= len(read) <= 64
    for wanted in range(1, 500):
        assert next(results).path == f"{wanted}.py"
        assert len(read) <= wanted + 2 * 64 + 1
    assert [result.path for result in results] == [f"{number}.py" for number in range(500, 1000)]


def test_what_a_generator_raises_comes_behind_the_files_in_front_of_it() -> None:
    def sources() -> Iterator[tuple[str, bytes]]:
        for number in range(100):
            yield f"{number}.py", b"x = 1\n" if number % 10 else b"# coding: klingon\n"
        raise LookupError("no more of them")

    results = analyze_files(sources())
    seen = []
    with pytest.raises(LookupError, match="no more of them"):
        seen.extend(result.path for result in results)
    assert next(results, None) is None
    assert [path for path, _ in results.problems] == [f"{number}.py" for number in range(0, 100, 10)]


def test_wrong_items_of_a_generator_are_told() -> None:
    with pytest.raises(TypeError, match="a source must be bytes or str, not int"):
        list(analyze_files(item for item in [("a.py", 3)]))


def test_threads_may_share_a_generator() -> None:
    results = analyze_files(((f"{i}.py", SHOP) for i in range(500)), jobs=2)
    seen: list[str] = []

    def read() -> None:
        for result in results:
            seen.append(result.path)

    threads = [threading.Thread(target=read) for _ in range(4)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert sorted(seen) == sorted(f"{i}.py" for i in range(500))


def test_closing_ends_a_generator() -> None:
    results = analyze_files((f"{i}.py", SHOP) for i in range(500))
    next(results)
    results.close()
    assert list(results) == []


# ---- pickles ----


@pytest.mark.parametrize("bindings", [False, True])
def test_results_pickle(bindings: bool) -> None:
    sources = [("shop.py", SHOP), ("broken.py", b"def f(:\n"), ("odd.py", b"# coding: klingon\n"), ("empty.py", b"")]
    for result in analyze_files(sources, bindings=bindings):
        copy = pickle.loads(pickle.dumps(result))
        assert repr(copy) == repr(result)
        for name in ("path", "problem", "size", "lines", "statements", "errors", "reports", "definitions"):
            assert getattr(copy, name) == getattr(result, name), name
        assert list(copy.records) == list(result.records)
        assert list(pickle.loads(pickle.dumps(result.records))) == list(result.records)
        if bindings and result.problem is None:
            assert [str(each) for each in copy.bindings.occurrences] == [
                str(each) for each in result.bindings.occurrences
            ]
            assert [scope.name for scope in copy.bindings.scopes] == [scope.name for scope in result.bindings.scopes]


def test_results_come_back_from_another_process() -> None:
    from concurrent.futures import ProcessPoolExecutor
    from multiprocessing import get_context

    with ProcessPoolExecutor(1, get_context("spawn")) as pool:
        result = pool.submit(_first_result, "shop.py", SHOP).result()
    assert [record.name for record in result.records][:2] == ["Shop", "total"]


def _first_result(path: str, source: bytes) -> quillet.FileAnalysis:
    return next(analyze_files([(path, source)]))


def test_damaged_bytes_are_refused() -> None:
    result = next(analyze_files([("shop.py", SHOP)], bindings=True))
    _, (_, data) = result.__reduce__()
    chance = random.Random(1)
    refused = 0
    for end in range(0, len(data), 7):
        with pytest.raises(ValueError, match="no bytes of a result"):
            _host.FileResult.FromBytes(data[:end])
    for _ in range(2000):
        damaged = bytearray(data)
        damaged[chance.randrange(len(data))] ^= 1 << chance.randrange(8)
        try:
            native = _host.FileResult.FromBytes(bytes(damaged))
        except ValueError:
            refused += 1
        else:
            native.Rows(0, native.record_count, tuple, _host.RECORD_KIND_WORDS)
            native.Definitions(tuple_of_arguments)
    assert refused > 200


def tuple_of_arguments(*arguments: object) -> tuple[object, ...]:
    return arguments


def test_what_hands_results_out_does_not_pickle() -> None:
    with pytest.raises(TypeError, match="pickled one by one"):
        pickle.dumps(analyze_files([("shop.py", SHOP)]))


def test_columns_of_a_generator() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    sources = [(f"{number}.py", SHOP) for number in range(100)]
    assert pyarrow.table(analyze_files(iter(sources))).equals(pyarrow.table(analyze_files(sources)))
    results = analyze_files(iter(sources))
    next(results)
    with pytest.raises(ValueError, match="read from its beginning"):
        pyarrow.table(results)


# ---- columns ----


def expected_rows(results: quillet.FileAnalyses) -> list[tuple[object, ...]]:
    return [(result.path, *row) for result in results for row in result.records.plain()]


PATHS = sorted((STDLIB / "json").glob("*.py"))


def test_pyarrow_reads_columns() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    results = analyze_files([*PATHS, "gone.py"], version=(3, 11))
    table = pyarrow.table(results)
    table.validate(full=True)
    columns = [table.column(name).to_pylist() for name in ("path", *FileRecord._fields)]
    assert list(zip(*columns, strict=True)) == expected_rows(analyze_files(PATHS, version=(3, 11)))
    assert results.problems == [("gone.py", "No such file or directory")]


def test_pyarrow_reads_many_batches() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    sources = [(f"{i}.py", b"name = call(value)\n" * 9000) for i in range(6)]
    batches = list(pyarrow.RecordBatchReader.from_stream(analyze_files(sources)))
    assert len(batches) > 1
    assert sum(batch.num_rows for batch in batches) == 6 * 9000 * 5
    assert {path for batch in batches for path in batch.column("path").to_pylist()} == {path for path, _ in sources}


# Two files that share scopes, names and one path, in more records than one batch holds.
SHARED = [(path, b"class A:\n    def f(self): pass\nclass B: x = 1\n" * 6000) for path in ("a.py", "b.py", "a.py")]


def shared_counts(*columns: str) -> dict[tuple[object, ...], int]:
    """How many records of SHARED have the same values in these columns, by the rows themselves."""
    names = ("path", *FileRecord._fields)
    places = [names.index(column) for column in columns]
    return dict(Counter(tuple(row[place] for place in places) for row in expected_rows(analyze_files(SHARED))))


def test_a_dictionary_has_each_text_once_and_is_that_of_all_batches() -> None:
    pyarrow = pytest.importorskip("pyarrow")
    table = pyarrow.table(analyze_files([*SHARED, ("empty.py", b"")]))
    dictionaries = {}
    for name in table.column_names:
        if pyarrow.types.is_dictionary(table.schema.field(name).type):
            chunks = [chunk.dictionary.to_pylist() for chunk in table.column(name).chunks]
            assert len(chunks) > 1
            assert all(chunk == chunks[0] for chunk in chunks)
            dictionaries[name] = chunks[0]
    assert dictionaries == {
        "path": ["a.py", "b.py", "empty.py"],
        "kind": list(_host.RECORD_KIND_WORDS),
    }


@pytest.mark.parametrize("columns", [("scope",), ("path",), ("kind",), ("path", "scope", "kind"), ("name",)])
def test_readers_agree_on_groups(columns: tuple[str, ...]) -> None:
    pyarrow = pytest.importorskip("pyarrow")
    expected = shared_counts(*columns)
    groups = pyarrow.table(analyze_files(SHARED)).group_by(list(columns)).aggregate([("line", "count")])
    rows = zip(*(groups.column(name).to_pylist() for name in (*columns, "line_count")), strict=True)
    assert {tuple(key): count for *key, count in rows} == expected
    assert groups.num_rows == len(expected)


@pytest.mark.parametrize("columns", [("scope",), ("path", "scope", "kind")])
def test_pandas_agrees_on_groups(columns: tuple[str, ...]) -> None:
    pyarrow = pytest.importorskip("pyarrow")
    pytest.importorskip("pandas")
    frame = pyarrow.table(analyze_files(SHARED)).to_pandas()
    assert list(frame["path"].cat.categories) == ["a.py", "b.py"]
    sizes = frame.groupby(list(columns), observed=True).size()
    found = {key if isinstance(key, tuple) else (key,): count for key, count in sizes.items()}
    assert found == shared_counts(*columns)


@pytest.mark.parametrize("columns", [("scope",), ("path", "scope", "kind")])
def test_polars_agrees_on_groups(columns: tuple[str, ...]) -> None:
    polars = pytest.importorskip("polars")
    frame = polars.DataFrame(analyze_files(SHARED))
    assert {tuple(key): count for *key, count in frame.group_by(columns).len().rows()} == shared_counts(*columns)


@pytest.mark.parametrize("columns", [("scope",), ("path", "scope", "kind")])
def test_duckdb_agrees_on_groups(columns: tuple[str, ...]) -> None:
    duckdb = pytest.importorskip("duckdb")
    records = analyze_files(SHARED)  # noqa: F841 -- found by its name
    names = ", ".join(columns)
    rows = duckdb.sql(f"select {names}, count(*) from records group by {names}").fetchall()
    assert {tuple(key): count for *key, count in rows} == shared_counts(*columns)
    assert len(rows) == len(shared_counts(*columns))


def test_polars_reads_columns() -> None:
    polars = pytest.importorskip("polars")
    frame = polars.DataFrame(analyze_files(PATHS, version=(3, 11)))
    assert frame.rows() == expected_rows(analyze_files(PATHS, version=(3, 11)))


def test_duckdb_reads_columns() -> None:
    duckdb = pytest.importorskip("duckdb")
    records = analyze_files(PATHS, version=(3, 11))  # noqa: F841 -- found by its name
    [(count,)] = duckdb.sql("select count(*) from records where kind = 'called'").fetchall()
    assert count == sum(row[5] == "called" for row in expected_rows(analyze_files(PATHS, version=(3, 11))))


def test_a_stream_that_nobody_reads_is_released() -> None:
    capsule = analyze_files([("a.py", SHOP)] * 100).__arrow_c_stream__()
    assert "arrow_array_stream" in repr(capsule)
    del capsule


# ---- formats ----


def test_a_phrase_is_the_same_for_one_record_and_for_a_file() -> None:
    source = (
        "import os.path as p\nfrom a import b\nx = y = [1], -2\nz: int = None\ndel x\nglobal g\n"
        "def f[T: int](*a, b='s'): yield from []; yield; return x(1)\nisinstance(x, C)\nq = [i for i in j] + k\n"
    )
    from quillet._batch import write_files
    from quillet.cli.output import output_format
    from quillet.cli.show import Style

    form = output_format("text", errors_only=False, style=Style(on=False))
    [result] = write_files([(b"a.py", source.encode(), None)], version=(3, 12), jobs=1, form=form)
    phrases = [
        line[4:].partition("  ")[2].strip() for line in bytes(result).decode().splitlines() if line[:4] == "    "
    ]
    expected = [describe(record) for line in analyze(source, version=(3, 12)).lines for record in line.records]
    assert phrases == expected


@pytest.mark.parametrize("form", ["text", "jsonl"])
def test_the_command_writes_the_same_bytes_whatever_the_jobs(form: str) -> None:
    def output(jobs: int) -> bytes:
        options = ["--format", form, "--jobs", str(jobs)]
        command = [sys.executable, "-m", "quillet", "analyze", *options, str(STDLIB / "email")]
        return subprocess.run(command, capture_output=True, check=True, timeout=120).stdout

    one = output(1)
    assert len(one) > 100_000
    assert output(2) == one
    assert output(7) == one
