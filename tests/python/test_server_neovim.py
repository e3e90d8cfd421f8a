"""The language server in Neovim, which is driven by its own keys and asked by its own expressions, and set up as
docs/editors.md says.
"""

from __future__ import annotations

import json
import re
import shutil
import subprocess
import sys
import time
from collections.abc import Iterator
from pathlib import Path
from typing import Any

import pytest

from editing import EDITORS, MAIN, SHOP

pytest.importorskip("pygls")
NVIM = shutil.which("nvim")
if NVIM is None:
    pytest.skip("needs Neovim (Debian: apt-get install neovim)", allow_module_level=True)


def set_up() -> str:
    """The Lua of the document for this Neovim."""
    text = EDITORS.read_text(encoding="utf-8")
    new, old = re.findall(r"```lua\n(.*?)```", text, re.DOTALL)
    command = json.dumps([sys.executable, "-m", "quillet", "serve"])[1:-1]
    chosen = f"if vim.lsp.config then\n{new}\nelse\n{old}\nend\n"
    return chosen.replace('"quillet", "serve"', command)


class Neovim:
    """A headless Neovim, in whose place keys are pressed."""

    def __init__(self, folder: Path) -> None:
        (folder / "init.lua").write_text(set_up())
        self._address = str(folder / "nvim.sock")
        self._process = subprocess.Popen(
            [str(NVIM), "--headless", "-n", "-u", str(folder / "init.lua"), "--listen", self._address, "main.py"],
            cwd=folder,
            stdin=subprocess.DEVNULL,
            stdout=subprocess.DEVNULL,
            stderr=subprocess.DEVNULL,
        )

    def _remote(self, *arguments: str) -> str:
        done = subprocess.run(
            [str(NVIM), "--server", self._address, *arguments],
            capture_output=True,
            text=True,
            timeout=60,
            check=False,
        )
        return done.stdout or done.stderr

    def keys(self, keys: str) -> None:
        self._remote("--remote-send", keys)

    def ask(self, expression: str) -> Any:
        """The value of an expression of Vim's."""
        answer = self._remote("--remote-expr", f"json_encode({expression})")
        try:
            return json.loads(answer)
        except ValueError:
            return None

    def lua(self, expression: str) -> Any:
        quoted = expression.replace("'", "''")
        return self.ask(f"luaeval('{quoted}')")

    def until(self, question: Any, wanted: Any, seconds: float = 60) -> Any:
        """Asks until the answer is what is wanted."""
        deadline = time.monotonic() + seconds
        while True:
            answer = question()
            if (wanted(answer) if callable(wanted) else answer == wanted) or time.monotonic() > deadline:
                return answer
            time.sleep(0.1)

    def close(self) -> None:
        self._process.kill()
        self._process.wait()


@pytest.fixture(scope="module")
def neovim(tmp_path_factory: pytest.TempPathFactory) -> Iterator[Neovim]:
    folder = tmp_path_factory.mktemp("nvim").resolve()
    (folder / "shop.py").write_text(SHOP)
    (folder / "main.py").write_text(MAIN)
    (folder / "pyproject.toml").write_text("[tool.quillet]\n")
    editor = Neovim(folder)
    try:
        running = editor.until(lambda: editor.lua("#vim.lsp.buf_get_clients(0)"), lambda count: bool(count))
        assert running == 1
        attached = "vim.tbl_values(vim.lsp.buf_get_clients(0))[1].server_capabilities.hoverProvider"
        assert editor.until(lambda: editor.lua(attached), True) is True
        yield editor
    finally:
        editor.close()


@pytest.fixture(autouse=True)
def fresh(neovim: Neovim) -> None:
    neovim.keys("<C-\\><C-n>:silent! cclose<CR>:e! main.py<CR>")


def test_definition(neovim: Neovim) -> None:
    neovim.keys(":call cursor(4, 1)<CR>:lua vim.lsp.buf.definition()<CR>")
    place = "[expand('%:t'), line('.'), col('.')]"
    assert neovim.until(lambda: neovim.ask(place), ["shop.py", 6, 5]) == ["shop.py", 6, 5]


def test_references(neovim: Neovim) -> None:
    neovim.keys(":call setqflist([])<CR>:call cursor(5, 9)<CR>:lua vim.lsp.buf.references()<CR>")
    listed = "map(getqflist(), {_, at -> fnamemodify(bufname(at.bufnr), ':t') . ':' . at.lnum . ':' . at.col})"
    wanted = ["main.py:5:8", "shop.py:2:9", "shop.py:7:17"]
    assert sorted(neovim.until(lambda: neovim.ask(listed), lambda found: found and len(found) == 3)) == wanted


def test_completion(neovim: Neovim) -> None:
    neovim.keys(":set completeopt=menuone,noselect<CR>Gocorner.to<C-x><C-o>")
    shown = "map(copy(complete_info(['items']).items), {_, item -> item.word})"
    assert neovim.until(lambda: neovim.ask(shown), lambda found: bool(found)) == ["total"]
    neovim.keys("<C-n>")
    line = neovim.until(lambda: neovim.ask("getline('.')"), "corner.total")
    assert line == "corner.total"


def test_problems_behind_a_keystroke(neovim: Neovim) -> None:
    found = "map(luaeval('vim.diagnostic.get(0)'), {_, at -> [at.lnum, at.code, at.severity]})"
    neovim.keys("Gomissing_name<Esc>")
    wanted = [[5, "unbound-name", 2]]
    assert neovim.until(lambda: neovim.ask(found), wanted) == wanted
    neovim.keys("A = (<Esc>")
    assert neovim.until(lambda: neovim.ask(found), lambda at: bool(at) and at[0][1] == "syntax")
    neovim.keys("dd")
    assert neovim.until(lambda: neovim.ask(found), []) == []


def test_hover_says_what_it_is(neovim: Neovim) -> None:
    neovim.keys(":call cursor(4, 1)<CR>:lua vim.lsp.buf.hover()<CR>")
    floats = "filter(map(getwininfo(), {_, at -> at.bufnr}), {_, at -> bufname(at) == ''})"
    text = f"map({floats}, {{_, at -> join(getbufline(at, 1, '$'), ' ')}})"
    shown = neovim.until(lambda: neovim.ask(text), lambda found: bool(found))
    assert any("def pay(shop: Shop)" in each for each in shown)


def test_rename_changes_all_buffers(neovim: Neovim) -> None:
    neovim.keys(":call cursor(4, 1)<CR>:lua vim.lsp.buf.rename('settle')<CR>")
    assert neovim.until(lambda: neovim.ask("getline(4)"), "settle(corner)") == "settle(corner)"
    assert neovim.ask("getline(1)") == "from shop import Shop, settle"
    neovim.keys(":wall<CR>:e shop.py<CR>")
    line = neovim.until(lambda: neovim.ask("getline(6)"), "def settle(shop: Shop):")
    assert line == "def settle(shop: Shop):"
