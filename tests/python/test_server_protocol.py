"""The language server as a process: positions, texts that change, questions that are taken back, what is no message,
and clients that go.
"""

from __future__ import annotations

import contextlib
import json
import os
import random
import signal
import subprocess
import sys
import time
from pathlib import Path
from typing import Any

import pytest

pytest.importorskip("pygls")

from bench.connection import Refused, ServerError
from serving import COMMAND, Client, edit

WIDE = "# -*- é -*-\r\n\tx = '😀ä'; wörld = 1\rif x:\n\tprint(x, '𝒳', wörld)\r\n"
UNITS = {
    "utf-8": lambda text: len(text.encode()),
    "utf-16": lambda text: len(text.encode("utf-16-le")) // 2,
    "utf-32": len,
}


def lines_of(text: str) -> list[str]:
    """Lines as the protocol has them, with their ends."""
    lines, begin, at = [], 0, 0
    while at < len(text):
        end = at + 2 if text[at : at + 2] == "\r\n" else at + 1 if text[at] in "\r\n" else 0
        if end:
            lines.append(text[begin:end])
            begin = end
        at = end or at + 1
    return [*lines, text[begin:]]


# ---- positions ----


@pytest.mark.parametrize("encoding", list(UNITS))
def test_positions_count_what_was_agreed(tmp_path: Path, encoding: str) -> None:
    units = UNITS[encoding]
    lines = [line.rstrip("\r\n") for line in lines_of(WIDE)]
    with Client(tmp_path.resolve(), encoding=encoding) as client:
        assert client.capabilities["positionEncoding"] == encoding
        client.open("wide.py", WIDE)
        last = lines[3]
        for name in ("x", "wörld"):
            begin = units(last[: last.index(name)])
            for character in (begin, begin + units(name)):
                place = {"line": 3, "character": character}
                found = client.Ask(
                    "textDocument/references",
                    {
                        "textDocument": {"uri": client.uri("wide.py")},
                        "position": place,
                        "context": {"includeDeclaration": True},
                    },
                )
                spans = [at["range"] for at in found]
                assert {"line": 3, "character": begin} in [span["start"] for span in spans], (name, character)
                for span in spans:
                    row = lines[span["start"]["line"]]
                    assert span["start"]["character"] in [
                        units(row[:at]) for at in range(len(row)) if row.startswith(name, at)
                    ]
                    assert span["end"]["character"] - span["start"]["character"] == units(name)
        beyond = {"textDocument": {"uri": client.uri("wide.py")}, "position": {"line": 10**9, "character": 2**31 - 1}}
        assert client.Ask("textDocument/definition", beyond) == []
        # An edit in the middle of a character that takes two units leaves the text whole.
        client.change("wide.py", edit(1, units("\tx = '"), 1, units("\tx = '😀"), "€"))
        client.texts["wide.py"] = WIDE.replace("😀", "€")
        [symbol] = [at for at in client.ask("documentSymbol", "wide.py") if at["name"] == "wörld"]
        assert symbol["selectionRange"]["start"] == {"line": 1, "character": units("\tx = '€ä'; ")}


def test_a_byte_order_mark_of_the_text_counts(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        client.open("mark.py", "\ufeffname = 1\nname\n")
        found = client.Ask(
            "textDocument/definition",
            {"textDocument": {"uri": client.uri("mark.py")}, "position": {"line": 1, "character": 0}},
        )
        assert client.shown(found) == ["mark.py:0:1-5"]
        client.change("mark.py", edit(0, 1, 0, 5, "other"), edit(1, 0, 1, 4, "other"))
        assert client.diagnostics("mark.py") == []


# ---- texts ----

PIECES = (
    "def f(a, b=1):\n    return a\n", "x = 1\n", "class C:\n    y = '😀'\n", "(", ")", "é", "\r\n", "\r", "\n", "    ",
    "import os\n", "'''", "#", "print(x)", "\t", "",
)  # fmt: skip


@pytest.mark.parametrize("encoding", list(UNITS))
def test_random_edits_leave_the_text_that_the_client_has(tmp_path: Path, encoding: str) -> None:
    units, chance = UNITS[encoding], random.Random(encoding)
    text = "import os\n\nclass A:\n    def f(self):\n        return 'ä😀'\n"
    with (
        Client(tmp_path.resolve(), encoding=encoding) as client,
        Client(tmp_path.resolve(), encoding=encoding) as fresh,
    ):
        client.open("a.py", text)
        for step in range(120):
            changes = []
            for _ in range(chance.choice((1, 1, 1, 3))):
                begin, end = sorted((chance.randrange(len(text) + 1), chance.randrange(len(text) + 1)))
                end = min(end, begin + 12)
                # Between the two of a line end there is no place.
                begin -= text[begin - 1 : begin + 1] == "\r\n"
                end -= text[end - 1 : end + 1] == "\r\n" and end > begin
                new = chance.choice(PIECES)
                rows = lines_of(text[:begin]), lines_of(text[:end])
                places = [(len(row) - 1, units(row[-1])) for row in rows]
                changes.append(edit(*places[0], *places[1], new))
                text = text[:begin] + new + text[end:]
            if chance.random() < 0.05:
                changes.append({"text": text})
            client.change("a.py", *changes)
            if step % 6:
                continue
            fresh.open(f"b{step}.py", text)
            same = client.ask("documentSymbol", "a.py")
            assert same == fresh.ask("documentSymbol", f"b{step}.py"), repr(text)
            told, wanted = client.diagnostics("a.py"), fresh.diagnostics(f"b{step}.py")
            assert told == wanted, repr(text)
            tokens = client.ask("semanticTokens/full", "a.py")
            assert tokens == fresh.ask("semanticTokens/full", f"b{step}.py"), repr(text)
            fresh.close(f"b{step}.py")


def test_answers_are_for_the_text_of_the_question(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        client.open("a.py", "")
        asked = []
        for number in range(200):
            client.change("a.py", edit(0, 0, 0, 0, f"name_{number} = {number}\n"))
            asked.append(client.Begin("textDocument/documentSymbol", {"textDocument": {"uri": client.uri("a.py")}}))
        for count, question in enumerate(asked, 1):
            assert len(client.Answer(question)) == count
        assert client.diagnostics("a.py") == []


def test_buffers_stand_for_files_that_are_not_there(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        document = {"uri": "untitled:Untitled-1", "languageId": "python", "version": 1, "text": "def f(): pass\nf()\n"}
        client.Tell("textDocument/didOpen", {"textDocument": document})
        asked = {"textDocument": {"uri": "untitled:Untitled-1"}, "position": {"line": 1, "character": 0}}
        [found] = client.Ask("textDocument/definition", asked)
        assert found["uri"] == "untitled:Untitled-1"
        (tmp_path / "gone.py").write_text("x = 1\n")
        client.open("gone.py")
        (tmp_path / "gone.py").unlink()
        assert client.shown(client.ask("definition", "gone.py", "x")) == ["gone.py:0:0-1"]
        client.close("gone.py")
        assert client.Ask("textDocument/documentSymbol", {"textDocument": {"uri": client.uri("gone.py")}}) is None


# ---- questions that are taken back, or that make way ----


@pytest.fixture(scope="module")
def large(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """A program in which references take a while."""
    folder = tmp_path_factory.mktemp("large").resolve()
    (folder / "base.py").write_text(
        "class Base:\n    def run(self, x):\n        return x\n\n\ndef use(x):\n    return x\n"
    )
    body = "".join(f"def f_{n}(a):\n    b = Base()\n    return use(b.run(use(a))) + f_{n}(b)\n\n\n" for n in range(60))
    for number in range(400):
        (folder / f"m_{number}.py").write_text(f"from base import Base, use\n\n\n{body}")
    return folder


REFERENCES = {"context": {"includeDeclaration": True}}


def test_a_question_is_taken_back(large: Path) -> None:
    with Client(large) as client:
        client.open("base.py")
        asked = {**client.at("base.py", "run"), **REFERENCES}
        questions = [client.Begin("textDocument/references", asked) for _ in range(3)]
        outline = client.Begin("textDocument/documentSymbol", {"textDocument": {"uri": client.uri("base.py")}})
        for question in questions:
            client.Tell("$/cancelRequest", {"id": question})
        for question in questions:
            with pytest.raises(Refused) as refused:
                client.Answer(question)
            assert refused.value.code == -32800
        assert len(client.Answer(outline)) == 2
        client.Tell("$/cancelRequest", {"id": 12345})
        assert len(client.ask("references", "base.py", "run", **REFERENCES)) == 1 + 400 * 60


def test_a_change_ends_a_question_of_its_text(large: Path) -> None:
    with Client(large) as client:
        client.open("base.py")
        question = client.Begin("textDocument/references", {**client.at("base.py", "run"), **REFERENCES})
        time.sleep(0.3)  # it has begun
        client.change("base.py", edit(0, 0, 0, 0, "import os\n"))
        # Unless it was done by then.
        with contextlib.suppress(Refused):
            assert len(client.Answer(question)) == 1 + 400 * 60
        client.texts["base.py"] = "import os\n" + client.texts["base.py"]
        assert client.shown(client.ask("definition", "base.py", "run")) == ["base.py:2:8-11"]


def test_what_is_urgent_does_not_wait(large: Path) -> None:
    with Client(large) as client:
        client.open("base.py")
        client.open("m_1.py")
        references = client.Begin("textDocument/references", {**client.at("base.py", "run"), **REFERENCES})
        time.sleep(0.3)
        client.change("m_1.py", edit(0, 0, 0, 0, "\n"))
        client.texts["m_1.py"] = "\n" + client.texts["m_1.py"]
        assert client.shown(client.ask("definition", "m_1.py", "Base,")) == ["base.py:0:6-10"]
        assert len(client.Answer(references)) == 1 + 400 * 60


# ---- what is no message ----


def test_malformed_messages_are_answered(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:

        def error_of(message: Any) -> tuple[Any, int]:
            begin = len(client.told)
            client.Send(message)
            answer = client.Wait(lambda told: "error" in told, begin)
            return answer["id"], answer["error"]["code"]

        assert error_of(b"Content-Length: 9\r\n\r\n{no json}") == (None, -32700)
        assert error_of(b"Content-Length: 4\r\n\r\n[[]]") == (None, -32600)
        assert error_of(b"Content-Length: x\r\n\r\n") == (None, -32700)
        assert error_of(b"Content-Length: -5\r\n\r\n") == (None, -32700)
        assert error_of(b"Content-Length: 3\r\n\r\n\xff\xfe\xfd") == (None, -32700)
        deep = b"[" * 100_000
        assert error_of(b"Content-Length: %d\r\n\r\n%s" % (len(deep), deep)) == (None, -32700)
        assert error_of({"jsonrpc": "2.0"}) == (None, -32600)
        assert error_of({"jsonrpc": "2.0", "id": 71, "method": 3}) == (None, -32600)
        assert error_of({"jsonrpc": "2.0", "id": "a", "method": "no/such"}) == ("a", -32601)
        assert error_of({"jsonrpc": "2.0", "id": 72, "method": "textDocument/hover"}) == (72, -32602)
        wrong = {"textDocument": {"uri": 5}, "position": {"line": "x"}}
        assert error_of({"jsonrpc": "2.0", "id": 73, "method": "textDocument/hover", "params": wrong}) == (73, -32602)
        again = {"jsonrpc": "2.0", "id": 74, "method": "initialize", "params": {"capabilities": {}}}
        assert error_of(again) == (74, -32600)
        client.Tell("no/such/notification", {})
        client.Tell("textDocument/didChange", {"textDocument": 1})
        # A header in other letters, with more than is needed.
        body = json.dumps({"jsonrpc": "2.0", "id": 75, "method": "no/such"}).encode()
        assert error_of(b"Content-Type: x\r\ncontent-length: %d\r\n\r\n%s" % (len(body), body)) == (75, -32601)
        client.open("a.py", "x = 1\n")
        assert len(client.ask("documentSymbol", "a.py")) == 1


def test_questions_come_in_their_time(tmp_path: Path) -> None:
    with Client(tmp_path.resolve(), initialize=False) as client:
        with pytest.raises(Refused) as refused:
            client.Ask("workspace/symbol", {"query": ""})
        assert refused.value.code == -32002
        client.Initialize({})
        assert client.Ask("shutdown", None) is None
        with pytest.raises(Refused) as refused:
            client.Ask("workspace/symbol", {"query": ""})
        assert refused.value.code == -32600
        client.Tell("exit", None)
        assert client.process.wait(20) == 0


# ---- clients that go ----


def test_it_ends_with_its_input(large: Path) -> None:
    with Client(large) as client:
        client.open("base.py")
        client.Begin("textDocument/references", {**client.at("base.py", "run"), **REFERENCES})
        assert client.process.stdin is not None
        client.process.stdin.close()
        assert client.process.wait(20) == 1


def test_exit_without_shutdown_is_an_error(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        client.Tell("exit", None)
        assert client.process.wait(20) == 1


@pytest.mark.skipif(os.name == "nt", reason="looks for a process as POSIX has them")
def test_it_ends_with_its_client(tmp_path: Path) -> None:
    """A client that is killed while somebody else holds its end of the pipe."""
    client = subprocess.Popen([sys.executable, "-c", "import time; time.sleep(600)"])
    try:
        with Client(tmp_path.resolve(), given={"processId": client.pid}) as held:
            client.kill()
            client.wait()
            assert held.process.wait(20) == 1
    finally:
        client.kill()


@pytest.mark.skipif(os.name == "nt", reason="sends a signal")
def test_an_interrupt_of_the_terminal_is_not_its_own(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        os.kill(client.process.pid, signal.SIGINT)
        client.open("a.py", "x = 1\n")
        assert len(client.ask("documentSymbol", "a.py")) == 1


def test_it_says_nothing_but_to_its_log(tmp_path: Path) -> None:
    log = tmp_path / "server.log"
    start = b'Content-Length: 76\r\n\r\n{"jsonrpc":"2.0","id":1,"method":"initialize","params":{"capabilities":{}}} '
    for more in ([], ["--log", str(log)]):
        done = subprocess.run(
            [*COMMAND, *more], input=start, capture_output=True, cwd=tmp_path, timeout=60, check=False
        )
        assert done.stderr == b""
        assert done.stdout.startswith(b"Content-Length: ")
        assert done.returncode == 1
    assert "initialize 1" in log.read_text()
    done = subprocess.run([*COMMAND, "--log", str(tmp_path / "no" / "x")], capture_output=True, timeout=60, check=False)
    assert done.returncode == 2
    assert b"No such file" in done.stderr


# ---- what folders may hold ----


def test_rings_of_links_and_files_that_nobody_may_read(tmp_path: Path) -> None:
    folder = tmp_path.resolve()
    (folder / "pack").mkdir()
    (folder / "pack" / "__init__.py").write_text("def inside(): pass\n")
    try:
        (folder / "pack" / "ring").symlink_to(folder, target_is_directory=True)
        (folder / "loop.py").symlink_to(folder / "loop.py")
    except OSError:
        pytest.skip("no symbolic links here")
    (folder / "binary.py").write_bytes(bytes(range(256)) * 100)
    (folder / "folder.py").mkdir()
    with Client(folder) as client:
        client.open("a.py", "from pack import inside\nimport loop, binary\ninside()\n")
        assert client.shown(client.ask("definition", "a.py", "inside()")) == ["__init__.py:0:4-10"]
        assert [at["name"] for at in client.Ask("workspace/symbol", {"query": "inside"})] == ["inside"]
        for name in ("loop.py", "folder.py"):
            assert client.Ask("textDocument/documentSymbol", {"textDocument": {"uri": client.uri(name)}}) is None
        (folder / "pack").rename(folder / "other")
        client.Tell("workspace/didChangeWatchedFiles", {"changes": [{"uri": client.uri("pack"), "type": 3}]})
        assert client.shown(client.ask("definition", "a.py", "inside()")) == ["a.py:0:17-23"]


def test_a_text_that_is_too_large_is_left_alone(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        client.open("large.py", "x = 1\n" * 6_000_000)
        said = client.Wait(lambda told: told.get("method") == "window/showMessage")["params"]["message"]
        assert said.endswith("large.py is not read: it has 36,000,000 characters, and 33,554,432 are the most")
        client.change("large.py", edit(0, 0, 0, 1, "y"))
        assert client.ask("documentSymbol", "large.py") == []
        client.open("small.py", "x = 1\n")
        assert len(client.ask("documentSymbol", "small.py")) == 1


def test_files_that_are_too_large_are_left_alone(tmp_path: Path) -> None:
    with (tmp_path / "large.py").open("wb") as file:  # on disk it takes no room
        file.truncate(100_000_000)
    (tmp_path / "a.py").write_text("import large\ndef here(): pass\nhere()\nlarge.here\n")
    with Client(tmp_path.resolve()) as client:
        client.open("a.py")
        assert client.shown(client.ask("definition", "a.py", "here()\n")) == ["a.py:1:4-8"]
        assert client.shown(client.ask("definition", "a.py", "large")) == ["large.py:0:0-0"]
        found = client.ask("references", "a.py", "here()", context={"includeDeclaration": True})
        assert client.shown(found)[:2] == ["a.py:1:4-8", "a.py:2:0-4"]
        assert [at["name"] for at in client.Ask("workspace/symbol", {"query": "here"})] == ["here"]
        asked = {"textDocument": {"uri": client.uri("large.py")}}
        assert not client.Ask("textDocument/documentSymbol", asked)


def test_files_and_folders_that_vanish(tmp_path: Path) -> None:
    folder = tmp_path.resolve()
    for name in ("one", "two"):
        (folder / name).mkdir()
        (folder / name / "__init__.py").write_text(f"def in_{name}(): pass\n")
    text = "from one import in_one\nfrom two import in_two\nin_one()\nin_two()\n"
    with Client(folder) as client:
        client.open("a.py", text)
        assert client.diagnostics("a.py") == []
        assert client.shown(client.ask("definition", "a.py", "in_two()")) == ["__init__.py:0:4-10"]
        (folder / "one" / "__init__.py").unlink()
        (folder / "one").rmdir()
        (folder / "two").rename(folder / "three")
        changes = [{"uri": client.uri(name), "type": kind} for name, kind in (("one", 3), ("two", 3), ("three", 1))]
        client.Tell("workspace/didChangeWatchedFiles", {"changes": changes})
        client.change("a.py", edit(4, 0, 4, 0, "\n"))
        told = client.diagnostics("a.py")
        assert [(at["code"], at["range"]["start"]["line"]) for at in told] == [
            ("unresolved-import", 0),
            ("unresolved-import", 1),
        ]
        [symbol] = client.Ask("workspace/symbol", {"query": "in_two"})
        assert symbol["location"]["uri"] == client.uri("three/__init__.py")
        client.open("b.py", "from three import in_two\nin_two()\n")
        assert client.shown(client.ask("definition", "b.py", "in_two()")) == ["__init__.py:0:4-10"]


def test_a_folder_that_vanishes(tmp_path: Path) -> None:
    folder = tmp_path.resolve() / "gone"
    folder.mkdir()
    (folder / "a.py").write_text("def here(): pass\n")
    with Client(folder) as client:
        client.open("a.py")
        assert len(client.Ask("workspace/symbol", {"query": "here"})) == 1
        (folder / "a.py").unlink()
        folder.rename(tmp_path / "other")
        client.Tell("workspace/didChangeWatchedFiles", {"changes": [{"uri": folder.as_uri(), "type": 3}]})
        # The buffer is there still.
        assert [at["name"] for at in client.ask("documentSymbol", "a.py")] == ["here"]
        assert client.ask("references", "a.py", "here", context={"includeDeclaration": True})
        client.change("a.py", edit(0, 4, 0, 8, "there"))
        assert [at["name"] for at in client.ask("documentSymbol", "a.py")] == ["there"]


def test_a_server_that_has_gone_is_noticed(tmp_path: Path) -> None:
    with Client(tmp_path.resolve()) as client:
        client.process.kill()
        with pytest.raises(ServerError):
            client.Ask("workspace/symbol", {"query": ""})
