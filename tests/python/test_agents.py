"""`quillet mcp`, asked by the protocol's own client: every tool, pages, what is refused, and how a session ends."""

from __future__ import annotations

import os
import subprocess
import sys
from collections.abc import Awaitable, Callable
from pathlib import Path
from typing import Any

import pytest

pytest.importorskip("mcp.client.client", reason="the package mcp is not installed, or older than version 2")

import anyio
from mcp.client.client import Client
from mcp.client.stdio import StdioServerParameters, stdio_client
from mcp.types import CallToolResult

from quillet.agents.server import server_of
from quillet.settings import load_settings

CART = '''\
"""Carts."""


class Item:
    """A thing."""

    price: float = 0


class Cart:
    def __init__(self, items):
        self.items = items

    def total(self, tax: float = 0) -> float:
        """What it costs."""
        return sum(item.price for item in self.items) * (1 + tax)


class Gift(Cart):
    def total(self, tax=0):
        return 0


def pay(cart: Cart, wallet):
    wallet.total()
    return cart.total()
'''
MAIN = """\
from shop.cart import Cart, pay

basket = Cart([])
pay(basket, None)
print(basket.total())
"""

Ask = Callable[..., Awaitable[CallToolResult]]


@pytest.fixture(autouse=True)
def no_active_environment(monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.delenv("VIRTUAL_ENV", raising=False)


@pytest.fixture
def project(tmp_path: Path) -> Path:
    folder = tmp_path / "project"
    (folder / "shop").mkdir(parents=True)
    (folder / ".git").mkdir()
    (folder / "shop" / "__init__.py").write_text("")
    (folder / "shop" / "cart.py").write_text(CART)
    (folder / "main.py").write_text(MAIN)
    return folder


def asked(project: Path, *questions: tuple[str, dict[str, Any]]) -> list[CallToolResult]:
    """The answers to questions, asked of a server in this process."""

    async def ask() -> list[CallToolResult]:
        async with Client(server_of(load_settings(project))) as client:
            return [await client.call_tool(name, arguments) for name, arguments in questions]

    return anyio.run(ask)


def answer(project: Path, tool: str, **arguments: Any) -> tuple[str, dict[str, Any]]:
    (result,) = asked(project, (tool, arguments))
    text = said(result)
    assert not result.is_error, text
    assert result.structured_content is not None
    return text, result.structured_content


def refusal(project: Path, tool: str, **arguments: Any) -> str:
    (result,) = asked(project, (tool, arguments))
    assert result.is_error
    return said(result)


def said(result: CallToolResult) -> str:
    (content,) = result.content
    assert content.type == "text"
    return content.text


def places(data: dict[str, Any]) -> list[tuple[str, int, int]]:
    return [(item["path"], item["line"], item["column"]) for item in data["items"]]


CART_PY = os.path.join("shop", "cart.py")


def test_a_symbol_is_found_by_a_part_of_its_name(project: Path) -> None:
    text, data = answer(project, "find_symbol", query="cart")
    assert text.splitlines()[1] == f"{CART_PY}:10: class shop.cart.Cart"
    assert data["items"][0] == {"name": "shop.cart.Cart", "kind": "class", "path": CART_PY, "line": 10, "column": 7}
    _, data = answer(project, "find_symbol", query="total", kind="method")
    assert [item["name"] for item in data["items"]] == ["shop.cart.Cart.total", "shop.cart.Gift.total"]


def test_an_outline_has_levels(project: Path) -> None:
    text, data = answer(project, "outline", path=CART_PY)
    assert "10-16 class Cart\n" in text
    assert "  14-16 method total(self, tax: float = 0) -> float\n" in text
    assert [item["name"] for item in data["items"]][:4] == ["Item", "price", "Cart", "__init__"]
    _, data = answer(project, "outline", path=CART_PY, depth=1)
    assert [item["name"] for item in data["items"]] == ["Item", "Cart", "Gift", "pay"]


def test_a_broken_file_has_an_outline_and_problems(project: Path) -> None:
    (project / "broken.py").write_text("def f(:\n  pass\nclass C:\n  def g(self): pass\n")
    _, data = answer(project, "outline", path="broken.py")
    assert [item["name"] for item in data["items"]] == ["f", "C", "g"]
    text, data = answer(project, "problems", path="broken.py")
    assert data["items"][0]["code"] == "syntax"
    assert text.startswith("broken.py: 1 problem\n1:7: syntax: ")


def test_a_definition_shows_its_source(project: Path) -> None:
    text, data = answer(project, "definition", symbol="Cart.total")
    assert data["items"][0]["source"].splitlines()[0] == "def total(self, tax: float = 0) -> float:"
    assert "return sum(item.price" in text
    assert "class Gift" not in text
    text, data = answer(project, "definition", symbol="total", path="main.py", line=5, source_lines=1)
    assert places(data) == [(CART_PY, 14, 9)]
    assert "return" not in text
    _, data = answer(project, "definition", path="main.py", line=5, column=7)
    assert places(data) == [("main.py", 3, 1)]


def test_a_definition_in_the_standard_library_is_shown(project: Path) -> None:
    pytest.importorskip("typeshed_client")
    (project / "join.py").write_text("import os\nos.path.join('a', 'b')\n")
    _, data = answer(project, "definition", symbol="join", path="join.py", line=2)
    assert data["items"]
    assert all("posixpath.py" in item["path"] for item in data["items"])
    assert data["items"][0]["source"].startswith("def join(")


def test_references_say_how_sure_they_are(project: Path) -> None:
    text, data = answer(project, "references", symbol="Cart.total")
    assert [(item["line"], item["certainty"]) for item in data["items"] if item["path"] == CART_PY] == [
        (14, "certain"),
        (25, "by name"),
        (26, "certain"),
    ]
    assert "25:12 call: wallet.total()  [by name]" in text
    assert "26:17 call: return cart.total()" in text
    _, data = answer(project, "references", symbol="Cart.total", at_least="certain")
    assert {item["certainty"] for item in data["items"]} == {"certain"}


def test_callers_and_callees_name_the_other_function(project: Path) -> None:
    text, data = answer(project, "callers", symbol="pay")
    assert places(data) == [("main.py", 4, 1)]
    assert "4:1 call main: pay(basket, None)" in text
    _, data = answer(project, "callees", symbol="pay")
    assert ("shop.cart.Cart.total", f"{CART_PY}:14") in {(item["name"], item["defined"]) for item in data["items"]}


def test_a_hierarchy_goes_both_ways(project: Path) -> None:
    assert places(answer(project, "hierarchy", direction="up", symbol="Gift")[1]) == [(CART_PY, 10, 7)]
    assert places(answer(project, "hierarchy", direction="down", symbol="Cart")[1]) == [(CART_PY, 19, 7)]
    assert places(answer(project, "hierarchy", direction="down", symbol="Cart.total")[1]) == [(CART_PY, 20, 9)]


def test_types_come_with_declaration_and_documentation(project: Path) -> None:
    text, data = answer(project, "types", path="main.py", line=5, symbol="basket")
    assert data["items"][0]["types"] == ["shop.cart.Cart"]
    text, data = answer(project, "types", symbol="Cart.total")
    assert text.startswith("def total(self, tax: float = 0) -> float\n")
    assert text.endswith("What it costs.")
    assert data["items"][0]["certainty"] == "certain"


def test_answers_come_in_pages(project: Path) -> None:
    (project / "many.py").write_text("from shop.cart import pay\n" + "pay(1, 2)\n" * 450)
    seen = []
    offset: int | None = 0
    while offset is not None:
        text, data = answer(project, "references", symbol="pay", limit=200, offset=offset)
        assert data["total"] == 454
        seen += places(data)
        offset = data["next_offset"]
        assert (f"offset={offset}" in text) == (offset is not None)
    assert len(seen) == len(set(seen)) == 454
    text, data = answer(project, "references", symbol="pay", offset=5000)
    assert (data["items"], data["next_offset"]) == ([], None)


def test_a_long_answer_is_cut_and_says_so(project: Path) -> None:
    line = "pay(" + ", ".join(f"argument_{i}" for i in range(100)) + ")\n"
    (project / "long.py").write_text("from shop.cart import pay\n" + line * 200)
    text, data = answer(project, "references", symbol="pay", limit=200)
    assert len(text) < 25_000
    assert 50 < len(data["items"]) < 200
    assert data["next_offset"] == len(data["items"])


def test_an_answer_is_of_the_files_as_they_are(project: Path) -> None:
    async def ask() -> list[int]:
        async with Client(server_of(load_settings(project))) as client:
            totals = []
            for more in ("", "pay(basket, 1)\n"):
                path = project / "main.py"
                path.write_text(path.read_text() + more)
                await anyio.sleep(1.1)  # files are looked at again after a second
                result = await client.call_tool("callers", {"symbol": "pay"})
                assert result.structured_content is not None
                totals.append(result.structured_content["total"])
            return totals

    assert anyio.run(ask) == [1, 2]


@pytest.mark.parametrize("path", ["/etc/passwd", "../secret.py", "link.py", "shop/../../secret.py", "folder/secret.py"])
@pytest.mark.parametrize("tool", ["outline", "problems", "definition"])
def test_what_lies_outside_of_the_roots_is_refused(project: Path, tool: str, path: str) -> None:
    outside = project.parent / "elsewhere"
    outside.mkdir()
    for secret in (project.parent / "secret.py", outside / "secret.py"):
        secret.write_text("password = 1\n")
    (project / "link.py").symlink_to(project.parent / "secret.py")
    (project / "folder").symlink_to(outside)
    place = {"line": 1, "column": 1} if tool == "definition" else {}
    message = refusal(project, tool, path=path, **place)
    assert "lies outside of the roots" in message
    assert "password" not in message


@pytest.mark.parametrize(
    ("arguments", "message"),
    [
        ({}, "give a dotted name as `symbol`"),
        ({"symbol": "nothing_of_this_name"}, "nothing is defined by the name 'nothing_of_this_name'"),
        ({"symbol": "total"}, "'total' names 2 definitions"),
        ({"path": "main.py"}, "a path needs a line"),
        ({"path": "main.py", "line": 1}, "say which name of the line is meant"),
        ({"path": "main.py", "line": 0, "column": 1}, "lines and columns count from 1"),
        (
            {"path": "main.py", "line": 4, "symbol": "basketball"},
            "line 4 does not hold 'basketball'; it is: pay(basket",
        ),
        ({"path": "main.py", "line": 99, "symbol": "a"}, "line 99 is empty"),
        ({"path": "nothing.py", "line": 1, "column": 1}, "there is no such file"),
        ({"path": "shop", "line": 1, "column": 1}, "is a folder"),
        ({"path": "", "line": 1, "column": 1}, "the path is empty"),
        ({"path": "a\0b", "line": 1, "column": 1}, "a path holds no zero byte"),
        ({"symbol": "pay", "limit": 0}, "greater than or equal to 1"),
        ({"symbol": "pay", "offset": -1}, "greater than or equal to 0"),
    ],
)
def test_what_cannot_be_answered_is_said_in_words(project: Path, arguments: dict[str, Any], message: str) -> None:
    assert message in refusal(project, "references", **arguments)


def test_settings_of_the_project_count(project: Path) -> None:
    (project / "broken.py").write_text("import nothing_like_this\nx = a a\n")
    (project / "pyproject.toml").write_text(
        '[tool.quillet]\ncertainty = "certain"\ndiagnostics = ["unresolved-import"]\nexclude = ["main.py"]\n'
    )
    _, data = answer(project, "problems", path="broken.py")
    assert [item["code"] for item in data["items"]] == ["unresolved-import"]
    _, data = answer(project, "references", symbol="Cart.total")
    assert places(data) == [(CART_PY, 14, 9), (CART_PY, 26, 17)]
    _, data = answer(project, "references", symbol="Cart.total", at_least="by name")
    assert places(data) == [(CART_PY, 14, 9), (CART_PY, 25, 12), (CART_PY, 26, 17)]


def test_every_tool_says_what_it_does_and_changes_nothing(project: Path) -> None:
    async def tools() -> list[Any]:
        async with Client(server_of(load_settings(project))) as client:
            return (await client.list_tools()).tools

    listed = anyio.run(tools)
    assert {tool.name for tool in listed} == {
        *("find_symbol", "outline", "definition", "references", "callers", "callees", "hierarchy", "types", "problems")
    }
    for tool in listed:
        assert tool.description
        assert tool.annotations.read_only_hint
        assert all("description" in field for field in tool.input_schema["properties"].values()), tool.name
        assert set(tool.output_schema["properties"]) == {"items", "total", "offset", "next_offset", "bounded"}


def command(project: Path, *arguments: str) -> StdioServerParameters:
    return StdioServerParameters(
        command=sys.executable, args=["-m", "quillet", "mcp", *arguments], cwd=str(project), env=dict(os.environ)
    )


def test_a_session_over_standard_streams(project: Path, tmp_path: Path) -> None:
    log = tmp_path / "log.txt"
    with open(tmp_path / "stderr", "w") as errors:

        async def ask() -> str:
            async with Client(stdio_client(command(project / "shop", "--log", str(log)), errlog=errors)) as client:
                assert (await client.call_tool("outline", {"path": "nothing.py"})).is_error
                return said(await client.call_tool("definition", {"symbol": "pay"}))

        assert f"{CART_PY}\n  24:5 definition: def pay(cart: Cart, wallet):" in anyio.run(ask)
    assert (tmp_path / "stderr").read_text() == ""
    assert "there is no such file" in log.read_text()


def test_it_ends_when_its_client_goes(project: Path) -> None:
    server = subprocess.run(
        [sys.executable, "-m", "quillet", "mcp"], cwd=project, input=b"", capture_output=True, timeout=60
    )
    assert (server.returncode, server.stdout, server.stderr) == (0, b"", b"")


def test_what_is_no_message_is_answered_or_left_out(project: Path) -> None:
    messages = [
        b"not json",
        b'{"jsonrpc": "2.0", "id": 1, "method": "no/such"}',
        b"\xff\xfe",
        b'{"jsonrpc": "2.0", "id": 2, "method": "initialize", "params": {"protocolVersion": "2025-06-18",'
        b' "capabilities": {}, "clientInfo": {"name": "test", "version": "1"}}}',
    ]
    server = subprocess.run(
        [sys.executable, "-m", "quillet", "mcp"],
        cwd=project,
        input=b"\n".join(messages) + b"\n",
        capture_output=True,
        timeout=60,
    )
    assert server.returncode == 0
    assert server.stderr == b""
    assert b'"id":1' in server.stdout
    assert b'"error"' in server.stdout
    assert b'"id":2' in server.stdout


@pytest.mark.parametrize(
    ("options", "message"),
    [
        (("--root", "nothing"), "nothing: No such file or directory"),
        (("--environment", "shop"), "is no environment of Python"),
        (("--log", "nothing/log"), "log: No such file or directory"),
    ],
)
def test_wrong_usage_is_said(project: Path, options: tuple[str, ...], message: str) -> None:
    server = subprocess.run(
        [sys.executable, "-m", "quillet", "mcp", *options], cwd=project, input="", capture_output=True, text=True
    )
    assert server.returncode == 2
    assert message in server.stderr
    assert server.stderr.count("\n") == 1


def test_a_wrong_setting_is_said_with_its_place(project: Path) -> None:
    (project / "pyproject.toml").write_text("[tool.quillet]\nroot = 'src'\n")
    server = subprocess.run(
        [sys.executable, "-m", "quillet", "mcp"], cwd=project, input="", capture_output=True, text=True
    )
    assert server.returncode == 2
    assert "pyproject.toml:2: root is unknown; there are roots," in server.stderr
    assert server.stderr.count("\n") == 1
