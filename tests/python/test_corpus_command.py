"""`quillet corpus`: every kind of source in, the same rows out, whatever is killed on the way."""

from __future__ import annotations

import io
import json
import os
import random
import shutil
import signal
import subprocess
import sys
import tarfile
import time
import zipfile
from pathlib import Path
from typing import Any

import pytest

import quillet
from quillet.corpus import shards, sources

pyarrow = pytest.importorskip("pyarrow")
from pyarrow import parquet  # noqa: E402

SHOP = b"import json\nclass Shop:\n    def total(self, price):\n        return json.loads(price)\n"


def run(*arguments: Any, **options: Any) -> subprocess.CompletedProcess[str]:
    command = [sys.executable, "-m", "quillet", "corpus", *map(str, arguments)]
    return subprocess.run(command, capture_output=True, text=True, timeout=300, **options)


def write_tar(path: Path, members: dict[str, bytes], mode: str = "w:gz") -> None:
    with tarfile.open(path, mode) as archive:
        for name, content in members.items():
            info = tarfile.TarInfo(name)
            info.size = len(content)
            archive.addfile(info, io.BytesIO(content))


def write_zip(path: Path, members: dict[str, bytes]) -> None:
    with zipfile.ZipFile(path, "w", zipfile.ZIP_DEFLATED) as archive:
        for name, content in members.items():
            archive.writestr(name, content)


def rows_of(out: Path, form: str = "records") -> list[tuple]:
    files = sorted((out / form).glob("part-*.parquet"))
    rows = [tuple(row.values()) for file in files for row in parquet.read_table(file).to_pylist()]
    return sorted(rows, key=repr)


@pytest.fixture
def mirror(tmp_path: Path) -> Path:
    """A folder with every kind of source."""
    folder = tmp_path / "mirror"
    (folder / "plain/sub").mkdir(parents=True)
    (folder / "plain/a.py").write_bytes(SHOP)
    (folder / "plain/sub/b.pyi").write_bytes(b"x: int\n")
    (folder / "plain/notes.txt").write_bytes(b"no Python\n")
    write_tar(folder / "flask-login-3.0.tar.gz", {"flask-login-3.0/a.py": SHOP, "flask-login-3.0/b.c": b"int x;"})
    write_tar(folder / "old_thing-0.1.tar.bz2", {"old_thing-0.1/setup.py": b"print 'x'\n"}, "w:bz2")
    write_zip(folder / "wheel_of-1.0-py3-none-any.whl", {"wheel_of/a.py": SHOP, "wheel_of/RECORD": b""})
    write_zip(folder / "z-2.zip", {"z-2/a.py": b"def f(:\n"})
    table = {"package": ["p", "q"], "path": ["1.py", "2.py"], "content": ["x = 1\n", "# coding: latin-1\ny = 'é'\n"]}
    parquet.write_table(pyarrow.table(table), folder / "data.parquet")
    (folder / "broken-1.tar.gz").write_bytes((folder / "flask-login-3.0.tar.gz").read_bytes()[:90])
    (folder / "broken.zip").write_bytes(b"PK no archive")
    return folder


def test_every_kind_of_source(mirror: Path, tmp_path: Path) -> None:
    out = tmp_path / "out"
    done = run(mirror, "-o", out, "--python", "auto")
    assert done.returncode == 0, done.stderr
    found = {row[:3] + row[3:4] + row[7:] for row in rows_of(out, "files")}
    assert {row[:4] + row[5:] for row in found} >= set()
    files = parquet.read_table(out / "files" / "part-000000.parquet").to_pylist()
    told = {(row["package"], row["source"], row["path"], row["python"], row["errors"]) for row in files}
    assert told == {
        ("plain", "mirror", "plain/a.py", "3.13", 0),
        ("plain", "mirror", "plain/sub/b.pyi", "3.13", 0),
        ("flask-login", "flask-login-3.0.tar.gz", "flask-login-3.0/a.py", "3.13", 0),
        ("old_thing", "old_thing-0.1.tar.bz2", "old_thing-0.1/setup.py", "2.7", 0),
        ("wheel_of", "wheel_of-1.0-py3-none-any.whl", "wheel_of/a.py", "3.13", 0),
        ("z", "z-2.zip", "z-2/a.py", "3.13", 1),
        ("p", "data.parquet", "1.py", "3.13", 0),
        ("q", "data.parquet", "2.py", "3.13", 0),
        ("broken", "broken-1.tar.gz", "", "3.13", 0),
        ("broken", "broken.zip", "", "3.13", 0),
    }
    problems = {row["source"]: row["problem"] for row in files if row["problem"]}
    assert set(problems) == {"broken-1.tar.gz", "broken.zip"}
    assert all(text.startswith("cannot be read to its end: ") for text in problems.values())
    assert "10 files" in done.stderr
    assert "1 syntax errors, 2 files with a problem" in done.stderr


def test_records_are_those_of_analyze_files(mirror: Path, tmp_path: Path) -> None:
    out = tmp_path / "out"
    assert run(mirror / "plain", mirror / "z-2.zip", "-o", out, "--python", "3.12").returncode == 0
    [file] = (out / "records").iterdir()
    table = parquet.read_table(file)
    kept = {"package", "source"}
    assert [(field.name, str(field.type)) for field in table.schema if field.name not in kept] == [
        (name, kind) for name, kind, _ in quillet.corpus.schema()
    ]
    inputs = [("a.py", SHOP), ("sub/b.pyi", b"x: int\n"), ("z-2/a.py", b"def f(:\n")]
    expected = []
    for result in quillet.analyze_files(inputs, version=(3, 12)):
        expected += [(result.path, *row, None) for row in result.records.plain()]
        expected += [(result.path, line, col, "", "", "error", "", False, text) for line, col, text in result.errors]
    found = table.drop_columns(list(kept)).to_pylist()
    assert sorted((tuple(row.values()) for row in found), key=repr) == sorted(expected, key=repr)
    assert [row["name"] for row in found] == sorted(row["name"] for row in found)


def test_occurrences(mirror: Path, tmp_path: Path) -> None:
    out = tmp_path / "out"
    assert run(mirror / "plain", "-o", out, "--occurrences").returncode == 0
    texts = parquet.read_table(out / "occurrences")["text"].to_pylist()
    assert texts == sorted(texts)
    assert texts.count("json") == 2


def test_row_groups_hold_few_names(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setattr(shards, "_GROUP_ROWS", 100)
    folder = tmp_path / "in"
    folder.mkdir()
    for number in range(20):
        (folder / f"{number}.py").write_text("".join(f"name_{n:03} = other_{n:03}\n" for n in range(100)))
    plan = shards.plan_of(str(tmp_path / "out"), "records", (3, 12), sources.Columns(), sources.units_of([str(folder)]))
    shards.run_shard(*shards.task_of(plan, 0))
    metadata = parquet.read_metadata(plan.path_of(0))
    names = [field.name for field in metadata.schema.to_arrow_schema()]
    statistics = [metadata.row_group(i).column(names.index("name")).statistics for i in range(metadata.num_row_groups)]
    assert len(statistics) > 30
    bounds = [bound for each in statistics for bound in (each.min, each.max)]
    assert bounds == sorted(bounds)
    assert sum(each.min <= "name_050" <= each.max for each in statistics) <= 2


@pytest.mark.parametrize("compressor", ["zstandard", "pyarrow"])
def test_pages_are_compressed_by_what_there_is(
    compressor: str, mirror: Path, tmp_path: Path, monkeypatch: pytest.MonkeyPatch
) -> None:
    if compressor == "pyarrow":
        monkeypatch.setitem(sys.modules, "zstandard", None)
    pytest.importorskip(compressor)
    units = sources.units_of([str(mirror / "plain")])
    plan = shards.plan_of(str(tmp_path / "out"), "records", (3, 12), sources.Columns(), units)
    shards.run_shard(*shards.task_of(plan, 0))
    table = parquet.read_table(plan.path_of(0))
    assert table["error"].null_count == table.num_rows > 0


@pytest.mark.parametrize("reader", ["duckdb", "polars", "pandas"])
def test_other_readers_take_the_files(reader: str, mirror: Path, tmp_path: Path) -> None:
    module = pytest.importorskip(reader)
    out = tmp_path / "out"
    assert run(mirror, "-o", out, "--python", "auto").returncode == 0
    for form in ("records", "files"):
        [file] = (out / form).iterdir()
        expected = parquet.read_table(file).to_pylist()
        if reader == "duckdb":
            found = module.connect().execute(f"select * from read_parquet('{file}')")
            rows = [dict(zip([each[0] for each in found.description], row, strict=True)) for row in found.fetchall()]
        elif reader == "polars":
            rows = module.read_parquet(file).to_dicts()
        else:
            rows = module.read_parquet(file, dtype_backend="pyarrow").to_dict("records")
            rows = [{key: None if value is module.NA else value for key, value in row.items()} for row in rows]
        assert rows == expected
        assert len(rows) > 8
    if reader == "polars":
        names = module.scan_parquet(out / "records").filter(module.col("name") == "json.loads").collect()
        assert set(names["kind"]) == {"called", "get"}


def test_finding_a_name(mirror: Path, tmp_path: Path) -> None:
    out = tmp_path / "out"
    run(mirror / "plain", mirror / "flask-login-3.0.tar.gz", "-o", out)
    found = run("find", "json.loads", out, "--kind", "called")
    assert sorted(found.stdout.splitlines()) == [
        "flask-login-3.0.tar.gz/flask-login-3.0/a.py:4:16: json.loads called with (price)",
        "plain/a.py:4:16: json.loads called with (price)",
    ]
    assert found.returncode == 0
    assert len(run("find", ".loads", out).stdout.splitlines()) == 4
    assert run("find", "nothing_of_it", out).returncode == 1
    missing = run("find", "json.loads", tmp_path)
    assert (missing.returncode, missing.stderr) == (2, f"quillet: {tmp_path} holds no records of a corpus\n")


def test_a_run_over_something_else_is_refused(mirror: Path, tmp_path: Path) -> None:
    out = tmp_path / "out"
    assert run(mirror / "plain", "-o", out).returncode == 0
    for arguments in ([mirror / "z-2.zip"], [mirror / "plain", "--python", "2.7"], [mirror / "plain", "--occurrences"]):
        refused = run(*arguments, "-o", out)
        assert refused.returncode == 2
        assert "holds a run over other inputs or with other options" in refused.stderr
    assert "is neither empty nor holds a run" in run(mirror / "plain", "-o", mirror).stderr
    assert "does not exist" in run(tmp_path / "nothing", "-o", tmp_path / "new").stderr


# ---- what is killed ----


@pytest.fixture
def many(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> Path:
    """Enough for some shards."""
    folder = tmp_path / "many"
    folder.mkdir()
    library = sorted(Path(os.__file__).parent.glob("*.py"))[:120]
    for number in range(12):
        members = {f"p{number}/{path.name}": path.read_bytes() for path in library[number * 10 : number * 10 + 10]}
        write_tar(folder / f"p{number}-1.0.tar.gz", members)
    # In the processes that are started as well.
    (tmp_path / "sitecustomize.py").write_text("import quillet.corpus.shards as s\ns._SHARD_BYTES = 400_000\n")
    monkeypatch.setenv("PYTHONPATH", f"{tmp_path}{os.pathsep}{os.environ.get('PYTHONPATH', '')}")
    return folder


def is_whole(out: Path, expected: dict[str, list[tuple]]) -> bool:
    manifest = json.loads((out / "manifest.json").read_text())
    names = {f"part-{number:06}.parquet" for number in range(len(manifest["shards"]))}
    return all(
        {path.name for path in (out / form).iterdir()} == names and rows_of(out, form) == rows
        for form, rows in expected.items()
    )


@pytest.mark.skipif(os.name != "posix", reason="kills by signals")
@pytest.mark.parametrize("jobs", [1, 2])
def test_a_run_that_is_killed_goes_on(many: Path, tmp_path: Path, jobs: int) -> None:
    begin = time.monotonic()
    assert run(many, "-o", tmp_path / "whole", "--jobs", jobs).returncode == 0
    whole = time.monotonic() - begin
    expected = {form: rows_of(tmp_path / "whole", form) for form in ("records", "files")}
    chance = random.Random(jobs)
    out = tmp_path / "out"
    command = [sys.executable, "-m", "quillet", "corpus", str(many), "-o", str(out), "--jobs", str(jobs)]
    kills = 0
    for _ in range(6):
        process = subprocess.Popen(command, stderr=subprocess.DEVNULL)
        deadline = time.monotonic() + chance.uniform(0, 0.8 * whole)
        while process.poll() is None and time.monotonic() < deadline:
            time.sleep(0.005)
        kills += process.poll() is None
        process.kill()
        process.wait()
        for path in out.glob("*/part-*"):
            parquet.read_metadata(path)  # whole, whatever was killed
    assert kills > 0
    done = run(many, "-o", out, "--jobs", jobs)
    assert done.returncode == 0, done.stderr
    assert is_whole(out, expected)
    assert not list(out.rglob(".unfinished-*"))


@pytest.mark.skipif(not Path("/proc/self/task").exists(), reason="finds workers by /proc")
def test_a_worker_that_is_killed_is_replaced(many: Path, tmp_path: Path) -> None:
    assert run(many, "-o", tmp_path / "whole").returncode == 0
    expected = {form: rows_of(tmp_path / "whole", form) for form in ("records", "files")}
    out = tmp_path / "out"
    command = [sys.executable, "-m", "quillet", "corpus", str(many), "-o", str(out), "--jobs", "2"]
    process = subprocess.Popen(command, stderr=subprocess.PIPE, text=True)
    killed = 0
    while process.poll() is None and killed < 2:
        children = Path(f"/proc/{process.pid}/task/{process.pid}/children")
        workers = [int(number) for number in children.read_text().split()] if children.exists() else []
        # The first child only tracks what the others share.
        if len(workers) > 1 and len(list(out.glob("records/part-*"))) > killed:
            os.kill(workers[-1], signal.SIGKILL)
            killed += 1
        time.sleep(0.02)
    _, errors = process.communicate(timeout=300)
    assert process.returncode == 0, errors
    assert killed > 0
    assert is_whole(out, expected)


@pytest.mark.parametrize("engine", ["dask", "ray", "spark"])
def test_engines_write_the_same(engine: str, many: Path, tmp_path: Path) -> None:
    pytest.importorskip({"dask": "distributed", "ray": "ray", "spark": "pyspark"}[engine])
    if engine == "spark" and shutil.which("java") is None:
        pytest.skip("Spark needs Java")
    assert run(many, "-o", tmp_path / "whole").returncode == 0
    expected = {form: rows_of(tmp_path / "whole", form) for form in ("records", "files")}
    environment = {**os.environ, "PYSPARK_PYTHON": sys.executable, "SPARK_LOCAL_IP": "127.0.0.1"}
    done = run(many, "-o", tmp_path / "out", "--engine", engine, "--jobs", 1, env=environment)
    assert done.returncode == 0, done.stderr
    assert is_whole(tmp_path / "out", expected)


def test_a_package_that_is_missing_is_named(mirror: Path, tmp_path: Path) -> None:
    (tmp_path / "distributed.py").write_text("raise ImportError\n")
    environment = {**os.environ, "PYTHONPATH": f"{tmp_path}{os.pathsep}{os.environ.get('PYTHONPATH', '')}"}
    told = run(mirror, "-o", tmp_path / "out", "--engine", "dask", env=environment)
    assert (told.returncode, told.stderr) == (2, "quillet: this engine needs a package: pip install quillet[dask]\n")
