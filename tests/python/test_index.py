"""The index: what a run takes and leaves, that no end of it does harm, and what is said of a bad file."""

from __future__ import annotations

import fcntl
import json
import os
import random
import signal
import sqlite3
import subprocess
import time
from pathlib import Path

import pytest

from indexing import COMMAND, ENVIRONMENT, ODD_NAMES, SHOP, content, make_index, run
from quillet import RecordKind, analyze_files
from quillet.index.questions import Index
from quillet.index.store import KINDS

OLD = 1_500_000_000


def index_path(folder: Path) -> Path:
    return folder / ".quillet-index"


def age(path: Path, seconds: int = OLD) -> None:
    """Gives a file a time that the index can trust."""
    os.utime(path, (seconds, seconds))


def analysed(stderr: str) -> int:
    return int(stderr.split(" records, ")[1].split(" analysed")[0])


# ---- what a run takes ----


def test_the_index_holds_what_the_analysis_says(tmp_path: Path) -> None:
    make_index(tmp_path, shop=SHOP)
    with analyze_files([str(tmp_path / "shop.py")]) as results:
        expected = [tuple(record) for result in results for record in result.records.plain()]
    assert len(expected) > 50
    with Index(str(index_path(tmp_path))) as index:
        (row,) = index.files()
        assert [tuple(hit)[1:8] for hit in index.records_of(row)] == expected
        assert row.records == len(expected)
        assert row.lines == SHOP.count("\n")


def test_kinds_are_those_of_the_host() -> None:
    assert list(KINDS) == [kind.value for kind in RecordKind]


def test_files_that_did_not_change_are_not_analysed_again(tmp_path: Path) -> None:
    for name in "ab":
        (tmp_path / f"{name}.py").write_text(f"{name} = 1\n")
        age(tmp_path / f"{name}.py")
    assert analysed(run("index", ".", cwd=tmp_path).stderr) == 2
    assert analysed(run("index", ".", cwd=tmp_path).stderr) == 0
    age(tmp_path / "a.py", OLD + 5)  # another time, the same content
    assert analysed(run("index", ".", cwd=tmp_path).stderr) == 0
    (tmp_path / "a.py").write_text("c = 1\n")
    assert analysed(run("index", ".", cwd=tmp_path).stderr) == 1
    with Index(str(index_path(tmp_path))) as index:
        assert [hit.name for row in index.files() for hit in index.records_of(row) if hit.kind == "set"] == ["c", "b"]


def test_a_change_that_leaves_size_and_time_is_seen_while_the_time_is_young(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("a = 1\n")
    now = time.time_ns()
    os.utime(path, ns=(now, now))
    run("index", ".", cwd=tmp_path)
    path.write_text("b = 1\n")
    os.utime(path, ns=(now, now))
    assert analysed(run("index", ".", cwd=tmp_path).stderr) == 1


def test_another_version_of_python_is_analysed_again_and_kept(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("print 1\n")
    age(tmp_path / "a.py")
    run("index", ".", "--python", "3.12", cwd=tmp_path)
    with Index(str(index_path(tmp_path))) as index:
        assert index.errors() == 1
    assert analysed(run("index", ".", "--python", "2.7", cwd=tmp_path).stderr) == 1
    assert analysed(run("index", ".", cwd=tmp_path).stderr) == 0
    with Index(str(index_path(tmp_path))) as index:
        assert index.errors() == 0
        assert index.python() == "2.7"


def test_files_that_are_gone_leave_the_index(tmp_path: Path) -> None:
    (tmp_path / "sub").mkdir()
    for name in ("a.py", "sub/b.py", "sub/c.py"):
        (tmp_path / name).write_text("x = 1\n")
    run("index", ".", cwd=tmp_path)
    (tmp_path / "sub/b.py").unlink()
    result = run("index", "sub", cwd=tmp_path)
    assert "1 removed" in result.stderr
    assert list(content(index_path(tmp_path))) == [b"a.py", b"sub/c.py"]


def test_a_run_without_paths_updates_what_was_indexed(tmp_path: Path) -> None:
    for name in ("one", "two", "other"):
        (tmp_path / name).mkdir()
        (tmp_path / name / "a.py").write_text("x = 1\n")
    run("index", "one", cwd=tmp_path)
    run("index", "two", cwd=tmp_path)
    (tmp_path / "two" / "b.py").write_text("y = 1\n")
    assert run("index", cwd=tmp_path / "one").returncode == 0
    assert list(content(index_path(tmp_path))) == [b"one/a.py", b"two/a.py", b"two/b.py"]


def test_gitignore_counts_as_in_analyze(tmp_path: Path) -> None:
    (tmp_path / ".gitignore").write_text("b.py\n")
    make_index(tmp_path, a="x = 1\n", b="y = 1\n")
    assert list(content(index_path(tmp_path))) == [b"a.py"]
    run("index", ".", "--no-gitignore", cwd=tmp_path)
    assert list(content(index_path(tmp_path))) == [b"a.py", b"b.py"]


def test_an_index_moves_with_its_folder(tmp_path: Path) -> None:
    old, new = tmp_path / "old", tmp_path / "new"
    old.mkdir()
    make_index(old, a="x = 1\n")
    old.rename(new)
    assert run("find", "x", cwd=new).stdout == "a.py:1:1: x = 1\n"


def test_texts_that_nothing_holds_any_more_are_dropped(tmp_path: Path) -> None:
    make_index(tmp_path, a="first = 1\n")
    for text in ("second = 1\n", "third = 1\n"):
        make_index(tmp_path, a=text)
    connection = sqlite3.connect(index_path(tmp_path))
    names = {name for (name,) in connection.execute("SELECT name FROM names")}
    connection.close()
    assert "third" in names
    assert "first" not in names


def test_the_tables_can_be_asked_by_sql(tmp_path: Path) -> None:
    make_index(tmp_path, shop=SHOP)
    connection = sqlite3.connect(index_path(tmp_path))
    rows = connection.execute("SELECT path, line, scope, name FROM facts WHERE kind = 'set' AND name = 'self.price'")
    assert rows.fetchall() == [("shop.py", 11, "Item.__init__", "self.price")]
    connection.close()


# ---- ends at the wrong moment, and runs at once ----


def write_modules(folder: Path, count: int, seed: int) -> None:
    chance = random.Random(seed)
    for number in range(count):
        lines = [f"def f{number}_{chance.randrange(9)}(x, y={line}): return x.a{line} + y\n" for line in range(40)]
        (folder / f"m{number}.py").write_text("".join(lines))


@pytest.mark.parametrize("seed", range(int(os.environ.get("QUILLET_KILLS", "8"))))
def test_a_killed_run_leaves_an_index_that_the_next_run_completes(tmp_path: Path, seed: int) -> None:
    source = tmp_path / "source"
    source.mkdir()
    write_modules(source, 60, seed)
    if seed % 2:
        run("index", "source", cwd=tmp_path)
        write_modules(source, 50, seed + 1)
        (source / "m55.py").unlink()
    process = subprocess.Popen(
        [*COMMAND, "index", "source"], cwd=tmp_path, env=ENVIRONMENT, stderr=subprocess.DEVNULL, start_new_session=True
    )
    # Between the start of the interpreter and the end of the run.
    time.sleep(random.Random(seed).uniform(0.02, 0.6))
    process.kill()
    process.wait()
    if index_path(tmp_path).exists() and index_path(tmp_path).stat().st_size:
        connection = sqlite3.connect(index_path(tmp_path))
        assert connection.execute("PRAGMA integrity_check").fetchall() == [("ok",)]
        connection.close()
    assert run("index", "source", cwd=tmp_path).returncode == 0
    assert run("index", "source", "-o", "fresh", cwd=tmp_path).returncode == 0
    assert content(index_path(tmp_path)) == content(tmp_path / "fresh")


def test_runs_at_once_leave_the_index_of_one(tmp_path: Path) -> None:
    write_modules(tmp_path, 60, 0)
    runs = [
        subprocess.Popen([*COMMAND, "index", "."], cwd=tmp_path, env=ENVIRONMENT, stderr=subprocess.PIPE)
        for _ in range(3)
    ]
    for process in runs:
        _, message = process.communicate(timeout=120)
        assert process.returncode == 0, message
    run("index", ".", "-o", "fresh", cwd=tmp_path)
    assert content(index_path(tmp_path)) == content(tmp_path / "fresh")


def test_a_run_says_that_it_waits(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = 1\n")
    with open(tmp_path / ".quillet-index.lock") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)
        process = subprocess.Popen(
            [*COMMAND, "index", "."], cwd=tmp_path, env=ENVIRONMENT, stderr=subprocess.PIPE, text=True
        )
        assert process.stderr is not None
        assert "another run is writing it; waiting" in process.stderr.readline()
        assert run("find", "x", cwd=tmp_path).returncode == 0  # who asks does not wait
    assert process.wait(timeout=60) == 0
    process.stderr.close()


def test_watch_follows_the_files(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    process = subprocess.Popen(
        [*COMMAND, "index", ".", "--watch"], cwd=tmp_path, env=ENVIRONMENT, stderr=subprocess.PIPE, text=True
    )
    assert process.stderr is not None
    try:
        assert "1 files" in process.stderr.readline()
        time.sleep(1)  # the watch has seen the folder as it is
        (tmp_path / "b.py").write_text("y = 1\n")
        assert "2 files" in process.stderr.readline()
        assert run("find", "y", cwd=tmp_path).stdout == "b.py:1:1: y = 1\n"
    finally:
        process.send_signal(signal.SIGINT)
        assert process.wait(timeout=60) == 130
        assert "Traceback" not in process.stderr.read()
        process.stderr.close()


# ---- bad input ----


def only_line(text: str) -> str:
    lines = text.splitlines()
    assert len(lines) == 1, text
    return lines[0]


def test_a_missing_path_is_named_and_the_others_are_indexed(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    result = run("index", "a.py", "missing", "-q", cwd=tmp_path)
    assert result.returncode == 1
    assert result.stderr.splitlines()[0] == "quillet: missing: No such file or directory"
    assert list(content(index_path(tmp_path))) == [b"a.py"]


def test_a_folder_without_python_is_said_to_be_one(tmp_path: Path) -> None:
    (tmp_path / "readme.txt").write_text("text\n")
    result = run("index", ".", cwd=tmp_path)
    assert result.returncode == 0
    assert "there are no Python files" in result.stderr


def test_an_unknown_encoding_is_told_at_every_run(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("# coding: nothing-such\nx = 1\n")
    age(path)
    for _ in range(2):
        result = run("index", ".", "-q", cwd=tmp_path)
        assert result.returncode == 1
        assert result.stderr.startswith("quillet: ./a.py: ")
        assert "nothing-such" in result.stderr


def test_a_binary_file_is_indexed_without_harm(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_bytes(random.Random(1).randbytes(5000))
    assert run("index", "a.py", "-q", cwd=tmp_path).returncode in (0, 1)
    assert run("stats", cwd=tmp_path).returncode == 0


@pytest.mark.parametrize("name", ["foreign.txt", "foreign.sqlite"])
@pytest.mark.parametrize("command", [["index", "a.py", "-o"], ["find", "x", "--index"]])
def test_a_foreign_file_is_left_alone(tmp_path: Path, name: str, command: list[str]) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    foreign = tmp_path / name
    if name.endswith("sqlite"):
        connection = sqlite3.connect(foreign)
        connection.execute("CREATE TABLE a (b)")
        connection.close()
    else:
        foreign.write_text("what somebody wrote\n" * 100)
    before = foreign.read_bytes()
    result = run(*command, name, cwd=tmp_path)
    assert result.returncode == (1 if command[0] == "index" else 2)
    assert "is no index of quillet" in only_line(result.stderr)
    assert foreign.read_bytes() == before


@pytest.mark.parametrize("command", [["index", "."], ["find", "x"], ["stats"]])
def test_a_damaged_index_is_told_in_one_line(tmp_path: Path, command: list[str]) -> None:
    make_index(tmp_path, shop=SHOP * 50)
    data = bytearray(index_path(tmp_path).read_bytes())
    data[4096:] = b"\xa5" * (len(data) - 4096)
    index_path(tmp_path).write_bytes(data)
    result = run(*command, cwd=tmp_path)
    assert result.returncode == (1 if command[0] == "index" else 2)
    assert "delete it" in only_line(result.stderr)


def test_an_index_of_another_schema_is_not_read(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = 1\n")
    connection = sqlite3.connect(index_path(tmp_path))
    connection.execute("PRAGMA user_version = 99")
    connection.close()
    assert "another version of quillet" in only_line(run("find", "x", cwd=tmp_path).stderr)


def test_without_an_index_the_answer_says_how_to_make_one(tmp_path: Path) -> None:
    result = run("find", "x", cwd=tmp_path)
    assert result.returncode == 2
    assert "quillet index ." in only_line(result.stderr)
    assert run("find", "x", "--index", "none", cwd=tmp_path).returncode == 2


@pytest.mark.parametrize(
    "arguments", [["index", "-"], ["index", ".", "-j", "0"], ["find"], ["find", ""], ["export", "x"]]
)
def test_wrong_usage_is_2(tmp_path: Path, arguments: list[str]) -> None:
    assert run(*arguments, cwd=tmp_path).returncode == 2


def test_odd_file_names_are_indexed_and_shown_on_one_line(tmp_path: Path) -> None:
    for name in ODD_NAMES:
        (tmp_path / os.fsdecode(name)).write_text("x = 1\n")
    run("index", ".", "-q", cwd=tmp_path)
    assert sorted(content(index_path(tmp_path))) == sorted(os.fsencode(name) for name in ODD_NAMES)
    lines = run("find", "x", cwd=tmp_path).stdout.splitlines()
    assert len(lines) == len(ODD_NAMES)
    assert all(line.endswith(":1:1: x = 1") for line in lines)
    rows = [json.loads(line) for line in run("find", "x", "--json", cwd=tmp_path).stdout.splitlines()]
    assert {os.fsencode(row["path"]) for row in rows} == {os.fsencode(name) for name in ODD_NAMES}
