"""The command line: what it writes where, which files it takes, how it ends."""

from __future__ import annotations

import json
import os
import pty
import subprocess
import sys
from collections.abc import Sequence
from pathlib import Path

import pytest

import quillet
from quillet.cli.show import printable, source_and_caret

ENVIRONMENT = {**os.environ, "PYTHONUTF8": "1", "NO_COLOR": "1"}


def run(
    *arguments: str | Path, stdin: bytes = b"", cwd: Path | None = None, front: Sequence[str] = ()
) -> subprocess.CompletedProcess[bytes]:
    return subprocess.run(
        [*front, sys.executable, "-m", "quillet", *map(str, arguments)],
        input=stdin,
        capture_output=True,
        cwd=cwd,
        env=ENVIRONMENT,
        timeout=60,
        check=False,
    )


def jsonl(*arguments: str | Path, stdin: bytes = b"", cwd: Path | None = None) -> list[dict[str, object]]:
    result = run("analyze", "--format", "jsonl", *arguments, stdin=stdin, cwd=cwd)
    return [json.loads(line) for line in result.stdout.splitlines()]


def files_read(folder: Path, *options: str) -> list[object]:
    rows = jsonl(*options, ".", cwd=folder)
    return list(dict.fromkeys(row["path"] for row in rows if row["type"] == "line"))


# ---- text ----


def test_text_names_each_statement_and_its_records(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("import os\n\nx = [\n    os.sep]\n")
    result = run("analyze", path)
    assert result.returncode == 0
    assert result.stderr == b""
    assert result.stdout.decode().splitlines() == [
        f"{path}:1: import os",
        "    os                  set",
        "    os                  import os",
        f"{path}:3: x = [ …",
        "    x                   set",
        "    x                   = a list",
        "    os                  read",
        "    os.sep              read",
    ]


def test_an_error_shows_its_line_and_a_caret() -> None:
    result = run("analyze", "-", "--stdin-filename", "name.py", stdin=b"x = 1\ny = = 2\n")
    assert result.returncode == 0
    assert result.stdout.decode().splitlines()[-3:] == [
        "name.py:2:5: invalid syntax",
        "    y = = 2",
        "        ^",
    ]


def test_errors_only_shows_nothing_else() -> None:
    result = run("analyze", "-", "--errors-only", stdin=b"x = 1\ny = = 2\n")
    assert result.stdout.decode().splitlines()[0] == "<stdin>:2:5: invalid syntax"
    assert len(result.stdout.splitlines()) == 3


@pytest.mark.parametrize(
    ("line", "column", "caret"),
    [
        ("x = = 1", 5, "    ^"),
        ("漢字 = = 1", 10, " " * 7 + "^"),
        ("e\u0301 = = 1", 7, "    ^"),
        ("\tx = = 1", 6, "\t    ^"),
        ("x =", 4, "   ^"),
        ("x =", 99, "   ^"),
    ],
)
def test_the_caret_stands_under_its_column(line: str, column: int, caret: str) -> None:
    assert source_and_caret(line.encode(), column) == (line, caret)


def test_of_a_very_long_line_the_part_around_the_error_is_shown() -> None:
    source, caret = source_and_caret(b"a" * 5000 + b"=" + b"b" * 5000, 5001)
    assert len(source) < 200
    assert source[len(caret) - 1] == "="


def test_control_characters_never_reach_the_terminal() -> None:
    assert printable("a\x1b[31m\r\nb\x00\u202ec\ud800\td") == "a\\x1b[31m\\r\\nb\\x00\\u202ec\\ud800\td"
    result = run("analyze", "-", stdin=b"x = '\x1b[31m'\ny = \x1b\n")
    assert b"\x1b" not in result.stdout


def on_terminal(*arguments: str, environment: dict[str, str]) -> bytes:
    main, side = pty.openpty()
    with subprocess.Popen(
        [sys.executable, "-m", "quillet", *arguments], stdout=side, stderr=subprocess.DEVNULL, env=environment
    ) as process:
        os.close(side)
        output = b""
        while True:
            try:
                chunk = os.read(main, 4096)
            except OSError:
                break
            if not chunk:
                break
            output += chunk
        process.wait(timeout=60)
    os.close(main)
    return output


def test_colours_are_for_terminals_that_want_them(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("x = 1\n")
    wanted = {key: value for key, value in ENVIRONMENT.items() if key != "NO_COLOR"} | {"TERM": "xterm"}
    assert b"\x1b[" in on_terminal("analyze", str(path), environment=wanted)
    assert b"\x1b[" not in on_terminal("analyze", str(path), environment=wanted | {"NO_COLOR": "1"})
    assert b"\x1b[" not in run("analyze", path).stdout


# ---- JSON lines ----


def test_json_lines_have_stable_keys() -> None:
    header, line = jsonl("-", "--python", "3.8", stdin=b"def f(a): pass\n")
    assert header == {"type": "header", "schema": 1, "python": "3.8"}
    assert line == {
        "type": "line",
        "path": "<stdin>",
        "first_line": 1,
        "last_line": 1,
        "indent": 0,
        "kind": "def",
        "in_async_def": False,
        "first_in_def": False,
        "records": [
            {"name": "f", "kind": "set", "detail": "", "is_parameter": False, "line": 1, "column": 5, "scope": ""},
            {"name": "a", "kind": "set", "detail": "", "is_parameter": True, "line": 1, "column": 7, "scope": "f"},
        ],
    }


def test_json_lines_place_errors_in_utf8_columns() -> None:
    rows = jsonl("-", "--errors-only", stdin="x = 1\né = = 2\n".encode())
    assert [row.get("error") for row in rows[1:]] == [{"message": "invalid syntax", "line": 2, "column": 6}]


def test_a_name_with_any_character_is_one_json_line(tmp_path: Path) -> None:
    path = os.fsencode(tmp_path) + b"/a\nb\xff.py"
    Path(os.fsdecode(path)).write_text("x = 1\n")
    rows = jsonl(tmp_path)
    assert [os.fsencode(str(row["path"])) for row in rows[1:]] == [path]


# ---- which files ----


def make(folder: Path, files: dict[str, str]) -> None:
    for name, text in files.items():
        path = folder / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text(text)


def test_a_folder_gives_its_python_files_in_order(tmp_path: Path) -> None:
    source = "x = 1\n"
    make(
        tmp_path,
        {
            "b.py": source,
            "a.pyi": source,
            "c.pyw": source,
            "notes.txt": source,
            "tool": f"#!/usr/bin/env python3\n{source}",
            "shell": f"#!/bin/sh\n{source}",
            "sub/z.py": source,
            ".hidden/h.py": source,
            ".git/hook.py": source,
        },
    )
    assert files_read(tmp_path) == ["./a.pyi", "./b.py", "./c.pyw", "./tool", "./.hidden/h.py", "./sub/z.py"]


def test_gitignore_files_count_where_git_reads_them(tmp_path: Path) -> None:
    source = "x = 1\n"
    make(
        tmp_path,
        {
            ".git/info/exclude": "excluded.py\n",
            ".gitignore": "build/\n*_gen.py\n/top.py\n",
            "top.py": source,
            "excluded.py": source,
            "kept.py": source,
            "build/b.py": source,
            "pkg/a_gen.py": source,
            "pkg/top.py": source,
            "pkg/.gitignore": "!a_gen.py\nlocal.py\n",
            "pkg/local.py": source,
            "pkg/deep/local.py": source,
            "other/a_gen.py": source,
            "other/local.py": source,
        },
    )
    assert files_read(tmp_path) == ["./kept.py", "./other/local.py", "./pkg/a_gen.py", "./pkg/top.py"]
    assert files_read(tmp_path / "pkg") == ["./a_gen.py", "./top.py"]
    assert len(files_read(tmp_path, "--no-gitignore")) == 10


def test_a_named_file_is_read_whatever_excludes_it(tmp_path: Path) -> None:
    make(tmp_path, {".gitignore": "*\n", "data.txt": "x = 1\n"})
    assert len(jsonl("data.txt", cwd=tmp_path)) == 2


def test_a_named_folder_is_read_whatever_excludes_it(tmp_path: Path) -> None:
    make(
        tmp_path,
        {".git/HEAD": "", ".gitignore": "venv\n*.pyi\n", "venv/lib/a.py": "x = 1\n", "venv/lib/b.pyi": "x = 1\n"},
    )
    assert files_read(tmp_path) == []
    assert files_read(tmp_path / "venv") == ["./lib/a.py", "./lib/b.pyi"]
    assert files_read(tmp_path / "venv" / "lib") == ["./a.py", "./b.pyi"]


def test_links_to_folders_are_not_followed(tmp_path: Path) -> None:
    make(tmp_path, {"pkg/a.py": "x = 1\n"})
    (tmp_path / "pkg" / "loop").symlink_to(tmp_path)
    assert files_read(tmp_path) == ["./pkg/a.py"]


def test_folders_that_are_nobodys_source_are_left_out_unless_named(tmp_path: Path) -> None:
    source = "x = 1\n"
    make(tmp_path, {f"{name}/a.py": source for name in (".venv/lib", "node_modules", "sub/__pycache__", "env", "kept")})
    make(tmp_path, {".venv/pyvenv.cfg": "", "env/pyvenv.cfg": ""})
    assert files_read(tmp_path) == ["./kept/a.py"]
    assert files_read(tmp_path, "--no-gitignore") == ["./kept/a.py"]
    assert files_read(tmp_path, "--exclude", "!.venv") == ["./.venv/lib/a.py", "./kept/a.py"]
    assert files_read(tmp_path, "--exclude", "!/env") == ["./env/a.py", "./kept/a.py"]
    assert files_read(tmp_path / ".venv") == ["./lib/a.py"]
    assert files_read(tmp_path / "node_modules") == ["./a.py"]


def test_exclude_takes_lines_of_a_gitignore_file(tmp_path: Path) -> None:
    source = "x = 1\n"
    make(
        tmp_path, {".gitignore": "gen.py\n"} | dict.fromkeys(("a.py", "gen.py", "#b.py", "t/a.py", "t/u/c.py"), source)
    )
    assert files_read(tmp_path, "--exclude", "/a.py", "--exclude", "#b.py", "--exclude", "u/") == ["./t/a.py"]
    assert files_read(tmp_path, "--exclude", "!gen.py", "--exclude", "t/**/c.py", "--exclude", "[a]*") == [
        "./#b.py",
        "./gen.py",
    ]
    assert len(jsonl("a.py", "--exclude", "a.py", cwd=tmp_path)) == 2


def test_a_repository_within_has_rules_of_its_own(tmp_path: Path) -> None:
    source = "x = 1\n"
    make(
        tmp_path,
        {
            ".git/HEAD": "",
            ".gitignore": "a.py\n",
            "a.py": source,
            "sub/.git": "gitdir: ../.git/modules/sub\n",
            ".git/modules/sub/info/exclude": "b.py\n",
            "sub/a.py": source,
            "sub/b.py": source,
        },
    )
    assert files_read(tmp_path) == ["./sub/a.py"]
    assert files_read(tmp_path / "sub") == ["./a.py"]


def test_stars_of_a_gitignore_file_cost_no_more_than_text(tmp_path: Path) -> None:
    make(tmp_path, {".gitignore": "*a" * 16 + "b\n!\nx\\\n[z-a].py\n", "a" * 200 + ".py": "x = 1\n", "m.py": "x = 1\n"})
    assert len(files_read(tmp_path)) == 2


def test_a_link_counts_where_its_file_is_among_what_was_named(tmp_path: Path) -> None:
    make(tmp_path, {"in/a.py": "x = 1\n", "in/data.txt": "x = 1\n", "out/b.py": "x = 1\n"})
    (tmp_path / "in" / "0.py").symlink_to("a.py")
    (tmp_path / "in" / "1.py").symlink_to("data.txt")
    (tmp_path / "in" / "2.py").symlink_to("data.txt")
    (tmp_path / "in" / "3.py").symlink_to("../out/b.py")
    (tmp_path / "in" / "4.py").symlink_to("/dev/zero")
    assert files_read(tmp_path / "in") == ["./a.py", "./1.py"]
    rows = jsonl("in", "out", cwd=tmp_path)
    assert [row["path"] for row in rows[1:]] == ["in/a.py", "out/b.py", "in/1.py"]
    assert len(jsonl("in/3.py", cwd=tmp_path)) == 2


def test_a_link_that_leads_nowhere_is_named_and_the_rest_is_served(tmp_path: Path) -> None:
    make(tmp_path, {"good.py": "x = 1\n"})
    (tmp_path / "a").symlink_to("b")
    (tmp_path / "b").symlink_to("a")
    (tmp_path / "long").symlink_to("n" * 300)
    (tmp_path / "below.py").symlink_to("good.py/below")
    (tmp_path / "gone").symlink_to("nowhere")
    (tmp_path / ".gitignore").symlink_to(".gitignore")
    result = run("analyze", ".", cwd=tmp_path)
    assert result.returncode == 1
    assert result.stdout.startswith(b"./good.py:1: x = 1")
    assert result.stderr.decode().splitlines() == [
        "quillet: ./a: Too many levels of symbolic links",
        "quillet: ./b: Too many levels of symbolic links",
        "quillet: ./below.py: Not a directory",
        "quillet: ./long: File name too long",
        "quillet: 4 files could not be read",
    ]


def test_a_link_into_a_closed_folder_is_named(tmp_path: Path, as_anyone: list[str]) -> None:
    make(tmp_path, {"closed/a.py": "x = 1\n", "good.py": "x = 1\n"})
    (tmp_path / "a").symlink_to("closed/a.py")
    (tmp_path / "closed").chmod(0)
    try:
        result = run("analyze", ".", cwd=tmp_path, front=as_anyone)
    finally:
        (tmp_path / "closed").chmod(0o700)
    assert result.returncode == 1
    assert b"good.py" in result.stdout
    assert len(result.stderr.splitlines()) == 3


def test_what_is_no_regular_file_is_opened_only_when_named(tmp_path: Path) -> None:
    make(tmp_path, {"good.py": "x = 1\n", "sub/good.py": "x = 1\n"})
    for name in ("pipe.py", "pipe", ".gitignore", "sub/.gitignore"):
        os.mkfifo(tmp_path / name)
    assert files_read(tmp_path) == ["./good.py", "./sub/good.py"]
    with subprocess.Popen(["sh", "-c", f"echo 'y = 1' > {tmp_path}/pipe.py"]) as writer:
        assert [row["path"] for row in jsonl("pipe.py", cwd=tmp_path)[1:]] == ["pipe.py"]
        writer.wait(timeout=60)


def test_a_device_is_not_read_to_its_end(tmp_path: Path) -> None:
    (tmp_path / "zero.py").symlink_to("/dev/zero")
    for command in ("analyze", "tree"):
        result = run(command, "zero.py", cwd=tmp_path)
        assert result.returncode == 1
        assert b"quillet: zero.py: is a device" in result.stderr
        with open("/dev/zero", "rb") as zero:
            result = subprocess.run(
                [sys.executable, "-m", "quillet", command, "-"],
                stdin=zero,
                capture_output=True,
                timeout=60,
                check=False,
            )
        assert result.returncode == 1
        assert b"is a device" in result.stderr
    for command in ("defs", "outline"):
        result = run(command, "zero.py", cwd=tmp_path)
        assert (result.returncode, result.stderr) == (2, b"quillet: zero.py: is a device\n")
    for command in ("index", "report"):
        result = run(command, "zero.py", "-o", "made", cwd=tmp_path)
        assert b"quillet: zero.py: is a device" in result.stderr
    assert run("analyze", "/dev/null").returncode == 0
    assert b"/dev/stdin:1: x = 1" in run("analyze", "/dev/stdin", stdin=b"x = 1\n").stdout


LIMITED = """
import sys
from quillet.tarvex import _host
_host.MOST_BYTES_READ = 3 << 20
from quillet.__main__ import main
main()
"""


def test_a_pipe_is_read_up_to_a_limit(tmp_path: Path) -> None:
    for command, size, said in (
        ("analyze", 3 << 20, b""),
        ("analyze", (3 << 20) + 1, b"quillet: -: the source is too large: more than 3 MiB\n"),
        ("tree", (3 << 20) + 1, b"quillet: -: the source is too large: more than 3 MiB\n"),
    ):
        result = subprocess.run(
            [sys.executable, "-c", LIMITED, command, "-"],
            input=b"#" * size,
            capture_output=True,
            timeout=60,
            check=False,
        )
        assert result.stderr.startswith(said)
        assert result.returncode == (1 if said else 0), result.stderr


# ---- how it ends ----


@pytest.mark.parametrize(
    "arguments",
    [
        ["analyze", ""],
        ["analyze", ".", ""],
        ["tree", ""],
        ["index", ""],
        ["index", ".", "-o", ""],
        ["find", "x", "--index", ""],
        ["find", "x", "--root", ""],
        ["defs", ""],
        ["outline", ""],
        ["stats", "--index", ""],
        ["export", "tags", "-o", ""],
        ["report", "-o", ""],
        ["report", "", "-o", "site"],
    ],
)
def test_an_empty_path_is_wrong_usage(arguments: list[str], tmp_path: Path) -> None:
    make(tmp_path, {"a.py": "x = 1\n"})
    result = run(*arguments, cwd=tmp_path)
    assert result.returncode == 2
    assert b"a path is empty" in result.stderr
    assert os.listdir(tmp_path) == ["a.py"]


def test_strict_fails_on_a_syntax_error() -> None:
    assert run("analyze", "-", stdin=b"x = = 1\n").returncode == 0
    assert run("analyze", "--strict", "-", stdin=b"x = = 1\n").returncode == 1
    assert run("analyze", "--strict", "-", stdin=b"x = 1\n").returncode == 0


def test_what_cannot_be_read_is_named_and_the_rest_is_served(tmp_path: Path) -> None:
    make(tmp_path, {"good.py": "x = 1\n", "odd.py": "# coding: no-such\n"})
    (tmp_path / "gone.py").symlink_to("nowhere")
    result = run("analyze", "missing.py", ".", cwd=tmp_path)
    assert result.returncode == 1
    assert b"./good.py:1: x = 1" in result.stdout
    assert result.stderr.decode().splitlines() == [
        "quillet: missing.py: No such file or directory",
        "quillet: ./gone.py: No such file or directory",
        "quillet: ./odd.py: cannot read the source as 'no-such': unknown encoding: no-such",
        "quillet: 3 files could not be read",
    ]


def test_the_version_is_told_at_once_and_as_click_tells_it() -> None:
    plain = run("--version")
    assert plain.stdout == f"quillet {quillet.__version__}\n".encode()
    assert plain.stdout == run("--version", "stats").stdout


def test_what_asks_for_the_version_loads_no_parser_of_options() -> None:
    script = """
import sys
from quillet.cli import main
try:
    main(["--version"])
except SystemExit:
    print("click" in sys.modules)
"""
    output = subprocess.run([sys.executable, "-c", script], capture_output=True, check=True).stdout
    assert output.split() == [b"quillet", quillet.__version__.encode(), b"False"]


@pytest.mark.parametrize(
    "arguments",
    [[], ["analyze"], ["analyze", "--format", "xml", "."], ["analyze", "--python", "2.6", "."], ["no-such"], ["tree"]],
)
def test_wrong_usage_ends_with_2(arguments: list[str]) -> None:
    result = run(*arguments)
    assert result.returncode == 2
    assert result.stdout == b""


def test_a_closed_pipe_ends_it_quietly(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("x = 1\n" * 50_000)
    command = [sys.executable, "-m", "quillet", "analyze", str(path)]
    with subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.PIPE, env=ENVIRONMENT) as process:
        assert process.stdout is not None
        assert process.stderr is not None
        process.stdout.read(10)
        process.stdout.close()
        assert process.stderr.read() == b""
        assert process.wait(timeout=60) == 0


def test_help_loads_nothing_of_the_engine() -> None:
    code = (
        "import sys, quillet.cli\n"
        "try: quillet.cli.main(['--help'])\n"
        "except SystemExit: pass\n"
        "print('quillet.tarvex' in sys.modules, file=sys.stderr)"
    )
    result = subprocess.run([sys.executable, "-c", code], capture_output=True, env=ENVIRONMENT, check=True)
    assert result.stderr.decode().strip() == "False"


# ---- trees ----


def test_tree_shows_the_statement_of_a_line(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("import os\nx = f(\n    a)\n")
    result = run("tree", f"{path}:3", "--python", "3.8")
    assert result.returncode == 0
    assert result.stdout.decode().splitlines() == [
        f"{path}:2: x = f( …",
        "    CExprStmt expr_stmt",
        "      CNameLiteral 'x'",
        "      CNode '='",
        "      CAtomExpr atom_expr",
        "        CNameLiteral 'f'",
        "        CTrailer trailer",
        "          CNode '('",
        "          CNameLiteral 'a'",
        "          CNode ')'",
    ]
    assert run("tree", f"{path}:2:5", "--python", "3.8").stdout == result.stdout


def test_tree_of_a_file_shows_every_statement(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("# note\n\nimport os\ndel x\n")
    heads = [line for line in run("tree", path).stdout.decode().splitlines() if not line.startswith(" ")]
    assert heads == [f"{path}:3: import os", f"{path}:4: del x"]


def test_tree_shows_a_syntax_error_in_its_place() -> None:
    result = run("tree", "-", stdin=b"x = = 1\n")
    assert result.stdout.decode().splitlines() == ["<stdin>:1:5: invalid syntax", "    x = = 1", "        ^"]


def test_tree_of_a_line_that_is_not_there(tmp_path: Path) -> None:
    path = tmp_path / "a.py"
    path.write_text("x = 1\n")
    result = run("tree", f"{path}:9")
    assert (result.returncode, result.stdout) == (2, b"")
    assert result.stderr.decode() == f"quillet: {path}: there is no line 9\n"
    assert run("tree", "missing.py").returncode == 1


def test_what_was_not_read_whole_is_said_in_words_with_its_line(tmp_path: Path) -> None:
    nested = "f(" * 60 + ")" * 60
    sources = {
        "deep.py": f"y\nx = {nested}\n",
        "wide.py": "x = " + "a + " * 20_000 + "a\n",
        "odd.py": "\n\nmatch ...:\n",
    }
    for name, source in sources.items():
        (tmp_path / name).write_text(source)
    assert run("analyze", *sources, cwd=tmp_path).stderr == b""
    result = run("analyze", "--exact", *sources, cwd=tmp_path)
    assert result.returncode == 0
    assert result.stderr.decode().splitlines()[:2] == [
        "quillet: deep.py:2: too deeply nested to be read whole; its records may be incomplete",
        "quillet: wide.py:1: too long to be read whole; its records may be incomplete",
    ]
    [odd] = result.stderr.decode().splitlines()[2:]
    assert odd.startswith("quillet: odd.py:3: could not be read whole, by an internal error: ")
