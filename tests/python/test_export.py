"""Exports of the index: tags as editors read them, SCIP decoded again, JSON lines, Parquet."""

from __future__ import annotations

import json
import os
import re
import shutil
import sqlite3
import subprocess
import sys
from pathlib import Path

import pytest

from indexing import ENVIRONMENT, ODD_NAMES, SHOP, make_index, run
from quillet.index import wire
from quillet.index.tags import escape


@pytest.fixture
def shop(tmp_path: Path) -> Path:
    make_index(tmp_path, shop=SHOP)
    return tmp_path


def odd_folder(folder: Path) -> Path:
    for name in ODD_NAMES:
        (folder / os.fsdecode(name)).write_text("def odd(x): return x\ny = 'a\tb'\nz['\t'] = 1\n")
    assert run("index", ".", "-q", cwd=folder).returncode == 0
    return folder


# ---- tags ----


def test_tags_name_definitions_with_kind_and_scope(shop: Path) -> None:
    assert run("export", "tags", cwd=shop).returncode == 0
    lines = (shop / "tags").read_text().splitlines()
    tags = [line for line in lines if not line.startswith("!_TAG_")]
    assert tags == sorted(tags)
    assert tags == [
        'D\tshop.py\t2;"\tx\tline:2\tlanguage:Python',
        'Item\tshop.py\t7;"\tc\tline:7\tlanguage:Python',
        'LIMIT\tshop.py\t4;"\tv\tline:4\tlanguage:Python',
        'Shop\tshop.py\t14;"\tc\tline:14\tlanguage:Python',
        '__init__\tshop.py\t10;"\tm\tline:10\tlanguage:Python\tclass:Item',
        'add\tshop.py\t15;"\tm\tline:15\tlanguage:Python\tclass:Shop',
        'main\tshop.py\t24;"\tf\tline:24\tlanguage:Python',
        'os\tshop.py\t1;"\tI\tline:1\tlanguage:Python',
        'path\tshop.py\t20;"\tm\tline:20\tlanguage:Python\tclass:Shop',
        'price\tshop.py\t8;"\tv\tline:8\tlanguage:Python\tclass:Item',
    ]


def test_tags_agree_with_ctags_on_classes_and_functions(shop: Path) -> None:
    ctags = shutil.which("ctags")
    if ctags is None or b"Universal" not in subprocess.run([ctags, "--version"], capture_output=True).stdout:
        pytest.skip("universal-ctags is not installed")
    assert run("export", "tags", cwd=shop).returncode == 0
    subprocess.run([ctags, "-f", "theirs", "--fields=+n", "--excmd=number", "shop.py"], cwd=shop, check=True)

    def rows(name: str) -> set[tuple[str, str, str]]:
        found = set()
        for line in (shop / name).read_text().splitlines():
            tag, file, address, kind, *_ = [*line.split("\t"), "", "", ""]
            if kind in ("c", "f", "m"):
                found.add((tag, file, address + kind))
        return found

    assert len(rows("tags")) == 6
    assert rows("tags") == rows("theirs")


def test_odd_file_names_keep_a_tag_on_its_line(tmp_path: Path) -> None:
    odd_folder(tmp_path)
    assert run("export", "tags", cwd=tmp_path).returncode == 0
    lines = (tmp_path / "tags").read_bytes().splitlines()
    tags = [line.split(b"\t") for line in lines if not line.startswith(b"!_TAG_")]
    assert sorted(row[1] for row in tags if row[0] == b"odd") == sorted(escape(os.fsencode(n)) for n in ODD_NAMES)
    assert all(re.fullmatch(rb'\d+;"', row[2]) for row in tags)


def test_escapes_of_tags_can_be_undone() -> None:
    value = bytes(range(256))
    escaped = escape(value)
    assert not re.search(rb"[\x00-\x1f\x7f]", escaped)
    undone = re.sub(rb"\\(\\|x..)", lambda m: b"\\" if m[1] == b"\\" else bytes.fromhex(m[1][1:].decode()), escaped)
    assert undone == value


# ---- SCIP ----


def message(data: bytes) -> dict[int, list[int | bytes]]:
    found: dict[int, list[int | bytes]] = {}
    for number, value in wire.fields(data):
        found.setdefault(number, []).append(value)
    return found


def scip_documents(path: Path) -> dict[str, dict[int, list[int | bytes]]]:
    index = message(path.read_bytes())
    return {message(document)[1][0].decode(): message(document) for document in index[2]}


def unpacked(data: bytes) -> list[int]:
    return [
        value
        for _, value in wire.fields(b"".join(b"\x08" + part for part in re.findall(rb"[\x80-\xff]*[\x00-\x7f]", data)))
    ]


def occurrences(document: dict[int, list[int | bytes]], symbol: str) -> list[tuple[list[int], int]]:
    rows = [message(data) for data in document.get(2, [])]
    return [(unpacked(row[1][0]), row.get(3, [0])[0]) for row in rows if row[2][0].decode() == symbol]


def test_scip_has_metadata_documents_symbols_and_occurrences(shop: Path) -> None:
    assert run("export", "scip", cwd=shop).returncode == 0
    metadata = message(message((shop / "index.scip").read_bytes())[1][0])
    assert message(metadata[2][0])[1] == [b"quillet"]
    assert metadata[3] == [shop.resolve().as_uri().encode()]
    document = scip_documents(shop / "index.scip")["shop.py"]
    assert document[4] == [b"Python"]
    assert document[6] == [1]  # columns are UTF-8 bytes
    symbols = {message(data)[1][0].decode(): message(data)[5][0] for data in document[3]}
    assert symbols["quillet . . . `shop.py`/Item#"] == 7
    assert symbols["quillet . . . `shop.py`/Shop#add()."] == 26
    assert symbols["quillet . . . `shop.py`/main()."] == 17
    assert symbols["quillet . . . `shop.py`/LIMIT."] == 61
    assert occurrences(document, "quillet . . . `shop.py`/Item#") == [
        ([6, 6, 10], 5),
        ([14, 24, 28], 8),
        ([25, 13, 17], 8),
    ]


def test_scip_locals_are_those_of_their_function(tmp_path: Path) -> None:
    make_index(tmp_path, a="def f(x):\n    y = x\n    return y\ndef g(x):\n    return x\n")
    assert run("export", "scip", cwd=tmp_path).returncode == 0
    document = scip_documents(tmp_path / "index.scip")["a.py"]
    rows = [message(data) for data in document[2]]
    by_place = {tuple(unpacked(row[1][0])): row[2][0].decode() for row in rows}
    assert by_place[0, 6, 7] == by_place[1, 8, 9]  # x of f
    assert by_place[3, 6, 7] == by_place[4, 11, 12]  # x of g
    assert by_place[0, 6, 7] != by_place[3, 6, 7]
    assert by_place[0, 6, 7].startswith("local ")


def test_scip_has_calls_attributes_of_self_and_broken_definitions(tmp_path: Path) -> None:
    source = (
        "class A:\n    def f(self, n)\n        self.n = n\n        return self.f(n=self.n)\n\nA().f(n=1)\nA = len(A)\n"
    )
    make_index(tmp_path, a=source)
    assert run("export", "scip", cwd=tmp_path).returncode == 0
    document = scip_documents(tmp_path / "index.scip")["a.py"]
    assert occurrences(document, "quillet . . . `a.py`/A#f().") == [([1, 8, 9], 5), ([3, 20, 21], 8)]
    assert occurrences(document, "quillet . . . `a.py`/A#n.") == [([2, 13, 14], 5), ([3, 29, 30], 8)]
    # The first binding is the definition, a later one a write.
    expected = [([0, 6, 7], 5), ([5, 0, 1], 8), ([6, 0, 1], 4), ([6, 8, 9], 8)]
    assert occurrences(document, "quillet . . . `a.py`/A#") == expected


def test_scip_takes_odd_names(tmp_path: Path) -> None:
    odd_folder(tmp_path)
    assert run("export", "scip", cwd=tmp_path).returncode == 0
    expected = [name if isinstance(name, str) else "\\udcff.py" for name in ODD_NAMES]
    assert sorted(scip_documents(tmp_path / "index.scip")) == sorted(expected)


def test_scip_leaves_out_what_lies_outside_its_root(tmp_path: Path) -> None:
    (tmp_path / "in").mkdir()
    (tmp_path / "out.py").write_text("x = 1\n")
    (tmp_path / "in" / "a.py").write_text("x = 1\n")
    run("index", "../out.py", ".", cwd=tmp_path / "in")
    result = run("export", "scip", "--root", str(tmp_path), cwd=tmp_path / "in")
    assert "out.py: left out" in result.stderr
    assert list(scip_documents(tmp_path / "in" / "index.scip")) == ["a.py"]


@pytest.mark.parametrize("value", [0, 1, 127, 128, 300, 2**32, 2**63])
def test_integers_of_messages_are_read_as_written(value: int) -> None:
    assert list(wire.fields(wire.varint(5 << 3) + wire.varint(value))) == [(5, value)]


@pytest.mark.parametrize("data", [b"\x80", b"\x0a\x05ab", b"\x0b", b"\x08" + b"\xff" * 11])
def test_a_bad_message_is_an_error(data: bytes) -> None:
    with pytest.raises(ValueError, match=r"field|integer"):
        list(wire.fields(data))


# ---- JSON lines and Parquet ----


def test_json_lines_have_a_header_and_all_records(shop: Path) -> None:
    rows = [json.loads(line) for line in run("export", "jsonl", cwd=shop).stdout.splitlines()]
    assert rows[0]["type"] == "header"
    assert (rows[0]["format"], rows[0]["schema"]) == ("quillet-index", 1)
    assert [row["path"] for row in rows if row["type"] == "file"] == ["shop.py"]
    records = [row for row in rows if row["type"] == "record"]
    assert len(records) == json.loads(run("stats", "--json", cwd=shop).stdout)["records"]
    assert {"name": "Shop", "opens": "class", "line": 14}.items() <= next(
        row for row in records if row["name"] == "Shop"
    ).items()


def test_json_lines_tell_errors_and_problems(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = = 1\n")
    (tmp_path / "b.py").write_text("# coding: nothing-such\n")
    run("index", cwd=tmp_path)
    rows = [json.loads(line) for line in run("export", "jsonl", cwd=tmp_path).stdout.splitlines()]
    assert [(row["path"], row["line"], row["column"]) for row in rows if row["type"] == "error"] == [("a.py", 1, 5)]
    assert "nothing-such" in next(row for row in rows if row.get("path") == "b.py")["problem"]


def test_odd_names_pass_through_json(tmp_path: Path) -> None:
    odd_folder(tmp_path)
    rows = [json.loads(line) for line in run("export", "jsonl", cwd=tmp_path).stdout.splitlines()]
    paths = sorted(os.fsencode(row["path"]) for row in rows if row["type"] == "file")
    assert paths == sorted(os.fsencode(name) for name in ODD_NAMES)


def test_parquet_holds_the_records_or_says_what_to_install(shop: Path) -> None:
    result = run("index", ".", "--format", "parquet", "-o", "out.parquet", cwd=shop)
    try:
        from pyarrow import parquet
    except ImportError:
        assert result.returncode == 1
        assert result.stderr == "quillet: Parquet needs the package pyarrow; install it with: pip install pyarrow\n"
        assert not (shop / "out.parquet").exists()
        return
    assert result.returncode == 0, result.stderr
    rows = parquet.read_table(shop / "out.parquet").to_pylist()
    assert len(rows) == json.loads(run("stats", "--json", cwd=shop).stdout)["records"]
    assert {row["path"] for row in rows} == {"shop.py"}
    assert not (shop / "out.parquet.part").exists()


def test_parquet_names_what_it_cannot_read_or_write(shop: Path) -> None:
    pytest.importorskip("pyarrow")
    result = run("index", ".", "gone.py", "--format", "parquet", "-q", "-o", "out.parquet", cwd=shop)
    assert result.returncode == 1
    assert result.stderr == "quillet: gone.py: No such file or directory\nquillet: 1 file could not be read\n"
    result = run("index", ".", "--format", "parquet", "-o", "missing/out.parquet", cwd=shop)
    assert result.returncode == 1
    assert result.stderr == f"quillet: missing/out.parquet: there is no folder {shop / 'missing'} to hold it\n"


def test_the_documented_questions_have_answers_in_duckdb(shop: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    duckdb = pytest.importorskip("duckdb")
    pytest.importorskip("pyarrow")
    (shop / "other.py").write_text(
        "from decimal import Decimal\ndef f(a, b: Decimal, *c): return Decimal(a) + Decimal(b)\n"
    )
    assert run("index", ".", "-q", cwd=shop).returncode == 0
    assert run("export", "parquet", cwd=shop).returncode == 0
    monkeypatch.chdir(shop)
    text = (Path(__file__).parents[2] / "docs" / "index.md").read_text(encoding="utf-8")
    questions = dict(re.findall(r"<!-- duckdb: (.*?) -->\n```sql\n(.*?)```", text, re.DOTALL))
    answers = {title: duckdb.sql(question).fetchall() for title, question in questions.items()}
    assert list(answers) == [
        "what is called most",
        "which modules names are taken from, and by how many files",
        "parameters that have no type hint",
    ]
    called, modules, unhinted = answers.values()
    assert ("Decimal", 2) in called
    assert ("decimal", 2) in modules
    assert [row for row in unhinted if row[0] == "other.py"] == [("other.py", 2, "f", "a"), ("other.py", 2, "f", "c")]


def test_tables_can_be_asked_by_sql(shop: Path) -> None:
    records = json.loads(run("stats", "--json", cwd=shop).stdout)["records"]
    assert run("export", "sqlite", cwd=shop).returncode == 0
    assert run("index", ".", "--format", "sqlite", "-q", "-o", "other.sqlite", cwd=shop).returncode == 0
    for name in ("quillet.sqlite", "other.sqlite"):
        connection = sqlite3.connect(shop / name)
        rows = connection.execute(
            "SELECT path, line, scope, name FROM facts WHERE kind = 'set' AND name = 'self.price'"
        )
        assert rows.fetchall() == [("shop.py", 11, "Item.__init__", "self.price")]
        assert connection.execute("SELECT count(*) FROM records").fetchone() == (records,)
        assert connection.execute("SELECT path, lines, problem FROM files").fetchall() == [(b"shop.py", 26, None)]
        assert connection.execute("PRAGMA integrity_check").fetchall() == [("ok",)]
        connection.close()
        assert not (shop / f"{name}.part").exists()


def test_tables_tell_errors_and_problems(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = = 1\n")
    (tmp_path / "b.py").write_text("# coding: nothing-such\n")
    run("index", cwd=tmp_path)
    result = run("export", "sqlite", "-o", "t.sqlite", cwd=tmp_path)
    assert "nothing-such" in result.stderr
    connection = sqlite3.connect(tmp_path / "t.sqlite")
    assert connection.execute("SELECT id >> 24, line, column FROM errors").fetchall() == [(1, 1, 5)]
    assert "nothing-such" in connection.execute("SELECT problem FROM files WHERE id = 2").fetchone()[0]
    connection.close()


@pytest.mark.parametrize("form", ["sqlite", "parquet"])
def test_tables_go_to_a_file_that_is_no_link(shop: Path, form: str) -> None:
    if form == "parquet":
        pytest.importorskip("pyarrow")
    (shop / "elsewhere").write_text("")
    (shop / "out").symlink_to("elsewhere")
    for target in ("-", "out"):
        result = run("export", form, "-o", target, cwd=shop)
        assert result.returncode == 2
        assert len(result.stderr.splitlines()) == 1
    assert (shop / "elsewhere").read_text() == ""


def test_an_export_as_parquet_holds_the_files_of_the_index(shop: Path) -> None:
    pytest.importorskip("pyarrow")
    from pyarrow import parquet

    (shop / "later.py").write_text("x = 1\n")
    assert run("export", "parquet", cwd=shop).returncode == 0
    rows = parquet.read_table(shop / "quillet.parquet").to_pylist()
    assert {row["path"] for row in rows} == {"shop.py"}


def test_an_export_that_cannot_be_written_is_told(shop: Path) -> None:
    result = run("export", "tags", "-o", "missing/tags", cwd=shop)
    assert result.returncode == 2
    assert len(result.stderr.splitlines()) == 1


@pytest.mark.parametrize("shell", ["bash", "zsh", "fish"])
def test_completion_names_the_command(tmp_path: Path, shell: str) -> None:
    result = run("completion", shell, cwd=tmp_path)
    assert result.returncode == 0
    assert "_QUILLET_COMPLETE" in result.stdout


def test_completion_offers_commands(tmp_path: Path) -> None:
    environment = {**ENVIRONMENT, "_QUILLET_COMPLETE": "bash_complete", "COMP_WORDS": "quillet o", "COMP_CWORD": "1"}
    result = subprocess.run(
        [sys.executable, "-c", "from quillet.cli import main; main()"],
        env=environment,
        capture_output=True,
        text=True,
        check=False,
    )
    assert result.stdout.splitlines() == ["plain,outline"]


def test_the_man_page_has_every_command_and_option() -> None:
    from quillet.cli.commands import group

    page = (Path(__file__).resolve().parent.parent.parent / "docs" / "man" / "quillet.1").read_text()
    page = page.replace("\\-", "-")
    assert len(group.commands) >= 10
    for name, command in group.commands.items():
        section = page.split(f".SS quillet {name} ")[1].split(".SS")[0]
        shown = [parameter for parameter in command.params if not getattr(parameter, "hidden", False)]
        for option in (option for parameter in shown for option in parameter.opts if option.startswith("-")):
            assert option in section, f"{name} {option}: scripts/man_page.py --write adds it"
