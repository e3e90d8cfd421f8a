"""The index: what a run takes and leaves, that no end of it does harm, and what is said of a bad file."""

from __future__ import annotations

import fcntl
import importlib.util
import json
import os
import random
import shutil
import signal
import sqlite3
import subprocess
import time
from pathlib import Path

import pytest

from indexing import COMMAND, ENVIRONMENT, ODD_NAMES, SHOP, content, make_index, run
from quillet import RecordKind, analyze_files
from quillet.index.questions import Index
from quillet.index.store import KINDS, read_index, settings_text
from quillet.tarvex import _host

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
    assert analysed(run("index", ".", "--force", cwd=tmp_path).stderr) == 2


def test_a_change_that_leaves_size_and_time_is_seen_while_the_time_is_young(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("a = 1\n")
    young = time.time_ns() + 600 * 10**9  # young still when a busy machine gets there
    os.utime(path, ns=(young, young))
    run("index", ".", cwd=tmp_path)
    path.write_text("b = 1\n")
    os.utime(path, ns=(young, young))
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


def test_two_installations_of_one_build_share_an_index(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    from quillet import tarvex
    from quillet.index.writing import engine_mark

    mark = engine_mark()
    assert tarvex.__file__
    copy = tmp_path / "copy.so"
    copy.write_bytes(Path(tarvex.__file__).read_bytes())
    age(copy)
    monkeypatch.setattr(tarvex, "__file__", str(copy))
    assert engine_mark() == mark
    copy.write_bytes(copy.read_bytes() + b"\0")
    assert engine_mark() != mark


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


def test_words_that_no_file_holds_any_more_are_dropped(tmp_path: Path) -> None:
    make_index(tmp_path, a="first = 1\n")
    assert b"first" in index_path(tmp_path).read_bytes()
    make_index(tmp_path, a="second = 1\n")
    assert b"first" not in index_path(tmp_path).read_bytes()


def test_the_same_files_give_the_same_bytes_whatever_came_before(tmp_path: Path) -> None:
    write_modules(tmp_path, 20, 0)
    run("index", ".", cwd=tmp_path)
    write_modules(tmp_path, 15, 1)
    (tmp_path / "m17.py").unlink()
    (tmp_path / "new.py").write_text("x = 1\n")
    for path in tmp_path.glob("*.py"):
        age(path)
    run("index", ".", cwd=tmp_path)
    run("index", ".", "-o", "fresh", cwd=tmp_path)
    assert index_path(tmp_path).read_bytes() == (tmp_path / "fresh").read_bytes()


def test_a_run_that_finds_nothing_new_writes_nothing(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    age(tmp_path / "a.py")
    run("index", ".", cwd=tmp_path)
    before = index_path(tmp_path).stat()
    assert run("index", cwd=tmp_path).returncode == 0
    after = index_path(tmp_path).stat()
    assert (after.st_ino, after.st_mtime_ns) == (before.st_ino, before.st_mtime_ns)


# ---- what is shown is what is there ----


def test_a_file_that_changed_since_is_read_as_it_is_now(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = 1\n", b="y = 1\n", c="x = 1\n")
    (tmp_path / "b.py").write_text("z = 1\nx = 2\n")
    (tmp_path / "c.py").unlink()
    result = run("find", "x", cwd=tmp_path)
    assert (result.stdout, result.stderr) == ("a.py:1:1: x = 1\nb.py:2:1: x = 2\n", "")
    assert run("find", "y", cwd=tmp_path).returncode == 1
    assert json.loads(run("stats", "--json", cwd=tmp_path).stdout)["records"] == 6


def places(folder: Path, *arguments: str) -> list[str]:
    return [line.rpartition(":")[0] for line in run("find", *arguments, cwd=folder).stdout.splitlines()]


def test_a_file_that_came_since_is_found(tmp_path: Path) -> None:
    make_index(tmp_path, b="x = 1\n", d="x = 1\n")
    for name in ("a", "c", "e", "new/f"):
        (tmp_path / f"{name}.py").parent.mkdir(exist_ok=True)
        (tmp_path / f"{name}.py").write_text("y = 1\nx = 2\n")
    (tmp_path / "script").write_text("#!/usr/bin/env python3\nx = 3\n")
    found = ["a.py:2:1", "b.py:1:1", "c.py:2:1", "d.py:1:1", "e.py:2:1", "new/f.py:2:1", "script:2:1"]
    assert places(tmp_path, "x") == found
    assert places(tmp_path, "x", "--path", "new/*") == ["new/f.py:2:1"]
    assert places(tmp_path, "x", "--exclude", "new") == [place for place in found if "new" not in place]
    (tmp_path / "d.py").rename(tmp_path / "moved.py")
    assert "moved.py:1:1" in places(tmp_path, "x")
    assert "d.py:1:1" not in places(tmp_path, "x")
    # The next run agrees.
    before = places(tmp_path, "x")
    assert run("index", "-q", cwd=tmp_path).returncode == 0
    assert places(tmp_path, "x") == before


def test_what_is_ignored_by_now_is_not_found(tmp_path: Path) -> None:
    (tmp_path / ".git").mkdir()
    for folder in ("kept", "built", "made"):
        (tmp_path / folder).mkdir()
        (tmp_path / folder / "a.py").write_text("x = 1\n")
    assert run("index", ".", "-q", "--exclude", "made", cwd=tmp_path).returncode == 0
    assert places(tmp_path, "x") == ["built/a.py:1:1", "kept/a.py:1:1"]
    (tmp_path / ".gitignore").write_text("built\n")
    (tmp_path / "made" / "b.py").write_text("x = 1\n")
    assert places(tmp_path, "x") == ["kept/a.py:1:1"]
    assert run("index", "--no-gitignore", "-q", cwd=tmp_path).returncode == 0
    assert places(tmp_path, "x") == ["built/a.py:1:1", "kept/a.py:1:1"]


def test_only_what_was_indexed_is_looked_at_for_new_files(tmp_path: Path) -> None:
    for name in ("src/a.py", "lib/a.py", "lib/one.py", "ignored.py"):
        (tmp_path / name).parent.mkdir(exist_ok=True)
        (tmp_path / name).write_text("x = 1\n")
    (tmp_path / ".git").mkdir()
    (tmp_path / ".gitignore").write_text("ignored.py\n")
    assert run("index", "src", "lib/one.py", "ignored.py", "-q", cwd=tmp_path).returncode == 0
    (tmp_path / "src" / "b.py").write_text("x = 1\n")
    (tmp_path / "lib" / "b.py").write_text("x = 1\n")
    assert places(tmp_path, "x") == ["ignored.py:1:1", "lib/one.py:1:1", "src/a.py:1:1", "src/b.py:1:1"]
    (tmp_path / "lib" / "one.py").unlink()
    assert places(tmp_path / "lib", "x") == [
        f"{tmp_path}/{name}" for name in ("ignored.py:1:1", "src/a.py:1:1", "src/b.py:1:1")
    ]


def test_new_files_outside_are_found_where_their_folder_is_named(tmp_path: Path) -> None:
    inside, outside = tmp_path / "in", tmp_path / "out"
    inside.mkdir()
    outside.mkdir()
    (inside / "a.py").write_text("x = 1\n")
    (outside / "a.py").write_text("x = 1\n")
    assert run("index", ".", "../out", "-q", cwd=inside).returncode == 0
    (outside / "b.py").write_text("x = 1\n")
    (tmp_path / "c.py").write_text("x = 1\n")
    (inside / "link.py").symlink_to(tmp_path / "c.py")
    assert places(inside, "x") == ["a.py:1:1"]
    for root in ("../out", ".."):
        assert places(inside, "x", "--root", root) == [f"{outside}/a.py:1:1", f"{outside}/b.py:1:1", "a.py:1:1"]


def test_asking_leaves_everything_as_it_is(tmp_path: Path) -> None:
    make_index(tmp_path, shop=SHOP)
    index_path(tmp_path).chmod(0o444)

    def look() -> list[tuple[str, int, int]]:
        return sorted((path.name, path.stat().st_ino, path.stat().st_mtime_ns) for path in tmp_path.iterdir())

    before = look(), tmp_path.stat().st_mtime_ns
    for command in (["find", "Shop"], ["defs", "shop.py"], ["outline", "shop.py"], ["stats"], ["export", "jsonl"]):
        assert run(*command, cwd=tmp_path).returncode == 0
    assert (look(), tmp_path.stat().st_mtime_ns) == before


def test_an_index_in_a_folder_that_one_may_not_write_can_be_asked(tmp_path: Path, as_anyone: list[str]) -> None:
    make_index(tmp_path, shop=SHOP)
    (tmp_path / ".quillet-index.lock").chmod(0o444)
    tmp_path.chmod(0o555)
    try:
        assert run("find", "LIMIT", cwd=tmp_path, front=as_anyone).stdout.startswith("shop.py:4:1: ")
        assert run("stats", cwd=tmp_path, front=as_anyone).returncode == 0
        result = run("index", cwd=tmp_path, front=as_anyone)
        assert result.returncode == 1
        assert only_line(result.stderr).endswith("Permission denied")
    finally:
        tmp_path.chmod(0o755)


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
    if index_path(tmp_path).exists():
        read_index(str(index_path(tmp_path)))  # an old one or a new one, whole
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
        if importlib.util.find_spec("watchfiles") is None:
            assert "pip install watchfiles" in process.stderr.readline()
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


def test_a_file_that_can_be_read_again_is_found_again(tmp_path: Path) -> None:
    (tmp_path / "a.py").symlink_to("later.txt")
    (tmp_path / "b.py").write_text("y = 1\n")
    run("index", ".", cwd=tmp_path)
    (tmp_path / "later.txt").write_text("x = 1\n")
    assert run("index", ".", cwd=tmp_path).returncode == 0
    assert run("find", "x", cwd=tmp_path).stdout == "a.py:1:1: x = 1\n"


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


@pytest.mark.parametrize("command", [["find", "x"], ["stats"], ["export", "jsonl"]])
def test_a_damaged_index_is_told_in_one_line_and_made_anew(tmp_path: Path, command: list[str]) -> None:
    make_index(tmp_path, shop=SHOP * 50)
    good = index_path(tmp_path).read_bytes()
    data = bytearray(good)
    data[100:] = b"\xa5" * (len(data) - 100)
    index_path(tmp_path).write_bytes(data)
    result = run(*command, cwd=tmp_path)
    assert result.returncode == 2
    assert "the index is damaged; make it anew with: quillet index" in only_line(result.stderr)
    result = run("index", ".", "-q", cwd=tmp_path)
    assert result.returncode == 0
    assert "the index is damaged; it is made anew" in only_line(result.stderr)
    assert run("find", "Shop", cwd=tmp_path).returncode == 0


def test_any_damage_is_noticed(tmp_path: Path) -> None:
    make_index(tmp_path, shop=SHOP, other="x = 1\n")
    good = index_path(tmp_path).read_bytes()
    assert _host.NameIndex.StateOf(good) == "fine"
    chance = random.Random(5)
    for number in range(400):
        data = bytearray(good)
        if number % 4 == 0:
            del data[chance.randrange(len(data)) :]
        else:
            data[chance.randrange(len(data))] ^= 1 << chance.randrange(8)
        assert _host.NameIndex.StateOf(bytes(data)) != "fine"
        with pytest.raises(ValueError, match="damaged"):
            _host.NameIndex(bytes(data))


def with_checksum(data: bytes) -> bytes:
    """An index that says of itself that it is whole."""
    return data[:16] + _host.HashOfSource(data[24:]).to_bytes(8, "little") + data[24:]


def test_bytes_that_are_planted_do_no_harm(tmp_path: Path) -> None:
    make_index(tmp_path, shop=SHOP, other="x = 1\n")
    good = index_path(tmp_path).read_bytes()
    assert with_checksum(good) == good
    chance = random.Random(6)
    read = 0
    for _ in range(3000):
        data = bytearray(good)
        for _ in range(chance.randrange(1, 4)):
            place = chance.randrange(24, len(data))
            data[place : place + chance.randrange(2)] = chance.randbytes(chance.randrange(3))
        try:
            index = _host.NameIndex(with_checksum(bytes(data)))
        except ValueError:
            continue
        read += 1
        index.Files()
        for number in index.FilesFor(_host.MakeQuestion("glob", "*a*", 1, True, "S*", False)):
            index.WordsOf(number)
    assert read > 20


def test_an_index_of_another_version_is_made_anew(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = 1\n")
    data = bytearray(index_path(tmp_path).read_bytes())
    data[12] += 1
    index_path(tmp_path).write_bytes(data)
    result = run("find", "x", cwd=tmp_path)
    assert result.returncode == 2
    assert "was made by another version of quillet; make it anew with: quillet index" in only_line(result.stderr)
    assert "it is made anew" in only_line(run("index", ".", "-q", cwd=tmp_path).stderr)
    assert run("find", "x", cwd=tmp_path).returncode == 0


def test_an_index_that_was_a_database_is_made_anew(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    connection = sqlite3.connect(index_path(tmp_path))
    connection.executescript(
        "PRAGMA journal_mode=WAL; PRAGMA application_id=0x51554C54; PRAGMA user_version=1; CREATE TABLE a (b)"
    )
    connection.close()
    assert "another version of quillet" in only_line(run("find", "x", cwd=tmp_path).stderr)
    assert "it is made anew" in only_line(run("index", ".", "-q", cwd=tmp_path).stderr)
    assert run("find", "x", cwd=tmp_path).stdout == "a.py:1:1: x = 1\n"


@pytest.mark.parametrize("kind", ["folder", "pipe"])
@pytest.mark.parametrize("name", [".quillet-index", ".quillet-index.lock", ".quillet-index.new"])
def test_what_is_no_file_is_told_in_one_line(tmp_path: Path, name: str, kind: str) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    if kind == "folder":
        (tmp_path / name).mkdir()
    else:
        os.mkfifo(tmp_path / name)
    result = run("index", "a.py", "-q", cwd=tmp_path)
    if kind == "pipe" and name.endswith(".new"):
        assert result.returncode == 0  # left behind by whoever, and in the way
        return
    assert result.returncode == 1
    assert str(tmp_path.name) in only_line(result.stderr) or name in only_line(result.stderr)


def test_a_named_pipe_is_told_without_waiting_for_it(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("x = 1\n")
    os.mkfifo(tmp_path / "pipe")
    for line in (("index", "pipe", "a.py", "-q"), ("report", "-o", "site", "pipe", "a.py")):
        result = run(*line, cwd=tmp_path)
        assert result.returncode == 1
        assert "pipe: is a pipe" in result.stderr
    assert "a.py:1:1" in run("find", "x", cwd=tmp_path).stdout
    assert (tmp_path / "site" / "index.html").exists()


def test_a_full_disk_leaves_the_old_index(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = 1\n")
    before = index_path(tmp_path).read_bytes()
    write_modules(tmp_path, 20, 0)
    code = (
        "import resource, sys\nresource.setrlimit(resource.RLIMIT_FSIZE, (1000, 1000))\n"
        "from quillet.cli import main\nmain(['index', '.', '-q'])"
    )
    result = subprocess.run(
        [COMMAND[0], "-c", code], cwd=tmp_path, env=ENVIRONMENT, capture_output=True, text=True, check=False
    )
    assert result.returncode == 1
    assert "File too large" in only_line(result.stderr)
    assert index_path(tmp_path).read_bytes() == before
    assert not (tmp_path / ".quillet-index.new").exists()


def in_a_namespace(script: str, folder: Path) -> subprocess.CompletedProcess[str]:
    """Runs a script of the shell where it may mount file systems; skips where nobody may."""
    unshare = shutil.which("unshare")
    if (
        unshare is None
        or subprocess.run([unshare, "-rm", "mount", "-t", "tmpfs", "none", folder], check=False).returncode
    ):
        pytest.skip("no file system can be mounted here")
    command = [unshare, "-rm", "sh", "-ec", script, *COMMAND]
    return subprocess.run(command, cwd=folder, env=ENVIRONMENT, capture_output=True, text=True, check=False)


def test_a_file_system_that_fills_up_leaves_the_old_index(tmp_path: Path) -> None:
    script = """
        mkdir disk; mount -t tmpfs -o size=64k none disk; cd disk
        echo 'x = 1' > a.py; "$0" "$@" index . -q; cp .quillet-index ../before
        i=0; while [ $i -lt 12000 ]; do echo "name_$i = $i"; i=$((i + 1)); done > ../many.py
        "$0" "$@" index . ../many.py -q && exit 9
        cmp .quillet-index ../before; "$0" "$@" find x; ls -A"""
    result = in_a_namespace(script, tmp_path)
    assert result.returncode == 0, result.stderr
    assert only_line(result.stderr).endswith("No space left on device")
    assert result.stdout.splitlines() == ["a.py:1:1: x = 1", ".quillet-index", ".quillet-index.lock", "a.py"]


def test_an_index_on_a_file_system_that_one_may_not_write_can_be_asked(tmp_path: Path) -> None:
    script = """
        mkdir disk; mount -t tmpfs none disk; cd disk
        echo 'x = 1' > a.py; "$0" "$@" index . -q; echo 'x = 2; x' > a.py; cd ..; mount -o remount,ro disk; cd disk
        "$0" "$@" find x; "$0" "$@" stats > /dev/null; "$0" "$@" index && exit 9
        "$0" "$@" find x -c"""
    result = in_a_namespace(script, tmp_path)
    assert result.returncode == 0, result.stderr
    assert result.stdout == "a.py:1:1: x = 2; x\na.py:1:8: x = 2; x\n2\n"
    assert only_line(result.stderr).endswith("Read-only file system")


# ---- what somebody else made ----


def plant(folder: Path, *paths: bytes, roots: tuple[str, ...] = (".",)) -> None:
    """Puts an index into a folder that names files of anywhere."""
    folder.mkdir(exist_ok=True)
    with open(folder / "seed.py", "w") as file:
        file.write("SECRET = 1\n")
    run("index", "seed.py", "-q", cwd=folder)
    stored = read_index(str(index_path(folder)))
    writer = _host.NameIndexWriter()
    words = written_words(b"SECRET = 1\n")
    for path in paths:
        writer.Add(path, 11, 5, 1, 0, None, words)
    stored.settings.roots = roots
    index_path(folder).write_bytes(writer.Finish(settings_text(stored.settings)))


def written_words(source: bytes) -> bytes:
    from quillet._languages import decode_source, native_language_of

    batch = _host.Batch(native_language_of(), [(b"a.py", source, None)], 1, decode_source, _host.WordsFormat(), False)
    return bytes(memoryview(batch.Next()))


def test_files_outside_of_the_folder_are_not_shown(tmp_path: Path) -> None:
    secret = tmp_path / "secret.py"
    secret.write_text("SECRET = 'of somebody'\n")
    folder = tmp_path / "project"
    folder.mkdir()
    (folder / "link.py").symlink_to(secret)
    (folder / "up").symlink_to(tmp_path)
    plant(
        folder,
        b"../secret.py",
        b"x/../../secret.py",
        os.fsencode(secret),
        b"link.py",
        b"up/secret.py",
        b"",
        b"..",
        b"a\0b",
        b"//" + os.fsencode(secret),
    )
    for command in (
        ["find", "SECRET"],
        ["find", "*", "--json"],
        ["export", "jsonl"],
        ["export", "tags", "-o", "-"],
        ["stats"],
    ):
        for result in (
            run(*command, cwd=folder),
            run(*command, "--index", "project/.quillet-index", cwd=tmp_path),
        ):
            assert "somebody" not in result.stdout
            assert "secret" not in result.stdout
            assert "Traceback" not in result.stderr
    run("report", "-o", "site", cwd=folder)
    pages = [path.read_text() for path in (folder / "site").rglob("*") if path.is_file()]
    assert pages
    assert not any("somebody" in page for page in pages)
    # Its owner may name the place.
    assert "of somebody" in run("find", "SECRET", "--root", "..", cwd=folder).stdout


def test_roots_outside_of_the_folder_are_not_walked_unless_named(tmp_path: Path) -> None:
    (tmp_path / "secret.py").write_text("SECRET = 1\n")
    folder = tmp_path / "project"
    plant(folder, roots=(".", "..", str(tmp_path)))
    result = run("index", cwd=folder)
    assert result.returncode == 0
    assert "lies outside the index's folder; name it to bring it up to date" in result.stderr
    assert list(content(index_path(folder), tmp_path)) == [b"seed.py"]


def test_a_file_outside_is_kept_and_told_until_its_folder_is_named(tmp_path: Path) -> None:
    (tmp_path / "in").mkdir()
    (tmp_path / "out.py").write_text("x = 1\n")
    (tmp_path / "in" / "a.py").write_text("x = 1\n")
    assert run("index", "../out.py", ".", "-q", cwd=tmp_path / "in").returncode == 0
    result = run("find", "x", cwd=tmp_path / "in")
    assert result.stdout == "a.py:1:1: x = 1\n"
    assert "1 file outside of" in only_line(result.stderr)
    result = run("find", "x", "--root", "..", cwd=tmp_path / "in")
    assert len(result.stdout.splitlines()) == 2
    assert result.stderr == ""


@pytest.mark.parametrize("name", [".quillet-index", ".quillet-index.lock", ".quillet-index.new"])
@pytest.mark.parametrize("target", ["there", "not there"])
def test_links_are_not_followed_where_something_is_written(tmp_path: Path, name: str, target: str) -> None:
    project = tmp_path / "project"
    project.mkdir()
    (project / "a.py").write_text("x = 1\n")
    elsewhere = tmp_path / "elsewhere"
    if target == "there":
        elsewhere.write_text("")
    (project / name).symlink_to(elsewhere)
    result = run("index", ".", "-q", cwd=project)
    if name.endswith(".new"):
        assert result.returncode == 0
    else:
        assert result.returncode == 1
        assert "is a link, which is not followed" in only_line(result.stderr)
    assert elsewhere.exists() == (target == "there")
    assert target == "not there" or elsewhere.read_text() == ""


# ---- git ----


def git(*arguments: str, cwd: Path) -> str:
    environment = {**ENVIRONMENT, "GIT_CONFIG_GLOBAL": os.devnull, "GIT_CONFIG_SYSTEM": os.devnull}
    identity = ("-c", "user.name=a", "-c", "user.email=a@b")
    result = subprocess.run(
        ["git", *identity, *arguments], cwd=cwd, env=environment, capture_output=True, text=True, check=True
    )
    return result.stdout


needs_git = pytest.mark.skipif(shutil.which("git") is None, reason="git is not installed")


@needs_git
def test_the_index_leaves_itself_out_of_git(tmp_path: Path) -> None:
    main = tmp_path / "main"
    (main / "sub").mkdir(parents=True)
    git("init", "-q", cwd=main)
    (main / "a.py").write_text("x = 1\n")
    git("add", ".", cwd=main)
    git("commit", "-qm", "a", cwd=main)
    git("worktree", "add", "-q", str(tmp_path / "tree"), cwd=main)
    for _ in range(2):
        for folder, path in ((main, "."), (main / "sub", ".."), (tmp_path / "tree", ".")):
            run("index", path, "--force", cwd=folder)
            assert (folder / ".quillet-index").exists()
            assert git("status", "--porcelain", cwd=folder) == ""
    lines = (main / ".git/info/exclude").read_text().splitlines()
    assert lines.count("/.quillet-index*") == 1
    assert lines.count("/sub/.quillet-index*") == 1


@needs_git
@pytest.mark.parametrize("planted", ["exclude", "info", "gitdir"])
def test_a_repository_that_leads_elsewhere_is_let_be(tmp_path: Path, planted: str) -> None:
    elsewhere = tmp_path / "elsewhere"
    (elsewhere / "info").mkdir(parents=True)
    (elsewhere / "info" / "exclude").write_text("")
    project = tmp_path / "project"
    project.mkdir()
    if planted == "gitdir":
        (project / ".git").write_text(f"gitdir: {elsewhere}\n")
        (elsewhere / "commondir").write_text(".\n")
    else:
        git("init", "-q", cwd=project)
        place = project / ".git" / "info"
        shutil.rmtree(place, ignore_errors=True)
        if planted == "info":
            place.symlink_to(elsewhere / "info")
        else:
            place.mkdir()
            (place / "exclude").symlink_to(elsewhere / "info" / "exclude")
    (project / "a.py").write_text("x = 1\n")
    assert run("index", ".", "-q", cwd=project).returncode == 0
    assert (elsewhere / "info" / "exclude").read_text() == ""


# ---- usage ----


@pytest.mark.parametrize(
    "arguments",
    [
        ["index", "-"],
        ["index", ".", "-j", "0"],
        ["index", ".", "-j", "100000"],
        ["find"],
        ["find", ""],
        ["export", "x"],
    ],
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


def test_what_was_left_out_stays_out_of_later_runs(tmp_path: Path) -> None:
    (tmp_path / "kept.py").write_text("total = 1\n")
    (tmp_path / "gen.py").write_text("total = 2\n")
    assert run("index", ".", "--exclude", "gen.py", "--exclude", "x y", cwd=tmp_path).returncode == 0
    (tmp_path / "gen.py").write_text("total = 3\n")
    assert run("index", cwd=tmp_path).returncode == 0
    settings = read_index(str(tmp_path / ".quillet-index")).settings
    assert settings.exclude == ("gen.py", "x y")
    assert "gen.py" not in run("find", "total", cwd=tmp_path).stdout
    assert "kept.py" in run("find", "total", cwd=tmp_path).stdout
