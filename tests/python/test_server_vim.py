"""The language server in Vim with the plugins that docs/editors.md names, set up as it says. Vim runs in a terminal of
its own, presses keys, and answers by a channel.
"""

from __future__ import annotations

import json
import os
import re
import shutil
import socket
import subprocess
import sys
import threading
import time
from collections.abc import Iterator
from pathlib import Path
from typing import Any

import pytest

from editing import EDITORS, MAIN, SHOP

pytest.importorskip("pygls")
pty = pytest.importorskip("pty")
VIM = shutil.which("vim")
if VIM is None or "+channel" not in subprocess.run([VIM, "--version"], capture_output=True, text=True).stdout:
    pytest.skip("needs Vim with channels (Debian: apt-get install vim)", allow_module_level=True)

# Where plugins are: those of Debian, those of the user's, or where the environment says.
PLACES = {
    "vim-lsp": [os.environ.get("VIM_LSP", ""), *map(str, Path.home().glob(".vim/pack/*/*/vim-lsp"))],
    "ale": ["/usr/share/vim-ale", *map(str, Path.home().glob(".vim/pack/*/*/ale"))],
}
PROBLEMS = {
    "vim-lsp": "map(lsp#internal#diagnostics#state#_get_all_diagnostics_grouped_by_server_for_uri(lsp#utils#"
    "get_buffer_uri())->get('quillet', {'params': {'diagnostics': []}}).params.diagnostics, {_, at -> at.code})",
    "ale": "map(copy(ale#engine#GetLoclist(bufnr())), {_, at -> at.code})",
}


def set_up(plugin: str, place: str) -> str:
    """The Vim script of the document for a plugin."""
    text = EDITORS.read_text(encoding="utf-8")
    blocks = dict(re.findall(r"(vim-lsp|ALE)\]?\(http[^\n]*\n+```vim\n(.*?)```", text, re.DOTALL))
    script = blocks["vim-lsp" if plugin == "vim-lsp" else "ALE"]
    script = script.replace("'cmd': ['quillet', 'serve']", f"'cmd': {[sys.executable, '-m', 'quillet', 'serve']}")
    script = script.replace("'executable': 'quillet'", f"'executable': '{sys.executable}'")
    script = script.replace("'%e serve'", "'%e -m quillet serve'")
    return f"set nocompatible nomore noswapfile hidden\nset runtimepath^={place}\nfiletype plugin on\n{script}\n"


class Vim:
    """A Vim in a terminal that nobody sees."""

    def __init__(self, folder: Path, plugin: str, place: str) -> None:
        listening = socket.create_server(("127.0.0.1", 0))
        address = f"127.0.0.1:{listening.getsockname()[1]}"
        script = (
            f"{set_up(plugin, place)}\nautocmd VimEnter * let g:seen = ch_open('{address}', {{'waittime': 5000}})\n"
        )
        (folder / "vimrc").write_text(script)
        self.plugin = plugin
        controller, terminal = pty.openpty()
        self._process = subprocess.Popen(
            [str(VIM), "-u", "vimrc", "-i", "NONE", "main.py"],
            cwd=folder,
            stdin=terminal,
            stdout=terminal,
            stderr=subprocess.DEVNULL,
            env={**os.environ, "TERM": "xterm", "VIRTUAL_ENV": ""},
        )
        os.close(terminal)
        self._screen = controller
        threading.Thread(target=self._show, daemon=True).start()
        listening.settimeout(60)
        self._channel, _ = listening.accept()
        listening.close()
        self._answers = self._channel.makefile("r", encoding="utf-8")
        self._number = 0

    def _show(self) -> None:
        try:
            while os.read(self._screen, 1 << 16):
                pass
        except OSError:
            return

    def _send(self, message: list[Any]) -> None:
        self._channel.sendall(json.dumps(message).encode() + b"\n")

    def do(self, command: str) -> None:
        self._send(["ex", command])

    def keys(self, keys: str) -> None:
        """Keys as in a mapping, worked off when Vim waits for some."""
        self.do(f'call feedkeys("{keys}", "t")')

    def ask(self, expression: str) -> Any:
        """The value of an expression."""
        self._number -= 1
        self._send(["expr", expression, self._number])
        decoder = json.JSONDecoder()
        held = ""
        while True:
            held += self._answers.readline()
            if not held:
                raise OSError("Vim has gone")
            number, answer = decoder.raw_decode(held)[0]
            if number == self._number:
                return answer
            held = ""

    def until(self, expression: str, wanted: Any, seconds: float = 60) -> Any:
        """Asks until the answer is what is wanted."""
        deadline = time.monotonic() + seconds
        while True:
            answer = self.ask(expression)
            if (wanted(answer) if callable(wanted) else answer == wanted) or time.monotonic() > deadline:
                return answer
            time.sleep(0.1)

    def close(self) -> None:
        self._process.kill()
        self._process.wait()
        self._channel.close()
        os.close(self._screen)


@pytest.fixture(scope="module", params=["vim-lsp", "ale"])
def vim(request: pytest.FixtureRequest, tmp_path_factory: pytest.TempPathFactory) -> Iterator[Vim]:
    place = next((place for place in PLACES[request.param] if place and Path(place).is_dir()), None)
    if place is None:
        debian = " (Debian: apt-get install vim-ale)" if request.param == "ale" else "; VIM_LSP says where it is"
        pytest.skip(f"needs the plugin {request.param}{debian}")
    folder = tmp_path_factory.mktemp("vim").resolve()
    (folder / "shop.py").write_text(SHOP)
    (folder / "main.py").write_text(MAIN)
    (folder / "setup.cfg").write_text("")
    (folder / ".git").mkdir()
    editor = Vim(folder, request.param, place)
    try:
        if request.param == "vim-lsp":
            assert editor.until("lsp#get_server_status('quillet')", "running") == "running"
        yield editor
    finally:
        editor.close()


@pytest.fixture(autouse=True)
def fresh(vim: Vim) -> None:
    vim.keys("\\<C-\\>\\<C-n>:silent! cclose | edit! main.py\\<CR>")


PLACE = "[expand('%:t'), line('.'), col('.')]"


def test_definition(vim: Vim) -> None:
    command = "LspDefinition" if vim.plugin == "vim-lsp" else "ALEGoToDefinition"
    vim.keys(f":call cursor(4, 1)\\<CR>:{command}\\<CR>")
    assert vim.until(PLACE, ["shop.py", 6, 5]) == ["shop.py", 6, 5]


def test_references(vim: Vim) -> None:
    command = "LspReferences" if vim.plugin == "vim-lsp" else "ALEFindReferences -quickfix"
    vim.keys(f":call setqflist([])\\<CR>:call cursor(4, 1)\\<CR>:{command}\\<CR>")
    listed = "map(getqflist(), {_, at -> fnamemodify(bufname(at.bufnr), ':t') . ':' . at.lnum . ':' . at.col})"
    wanted = ["main.py:1:24", "main.py:4:1"]  # one of the plugins leaves definitions out
    wanted += ["shop.py:6:5"] if vim.plugin == "vim-lsp" else []
    assert sorted(vim.until(listed, lambda each: len(each) >= len(wanted))) == wanted


def test_completion(vim: Vim) -> None:
    vim.keys(":set completeopt=menuone,noselect\\<CR>Gocorner.to\\<C-x>\\<C-o>")
    shown = "map(copy(complete_info(['items']).items), {_, item -> item.word})"
    assert [word.rstrip("(") for word in vim.until(shown, lambda found: bool(found))] == ["total"]


def test_problems_behind_a_keystroke(vim: Vim) -> None:
    vim.keys("Gomissing_name\\<Esc>")
    found = PROBLEMS[vim.plugin]
    assert vim.until(found, ["unbound-name"]) == ["unbound-name"]
    vim.keys("dd")
    assert vim.until(found, []) == []


def test_rename_changes_all_buffers(vim: Vim) -> None:
    command = "LspRename" if vim.plugin == "vim-lsp" else "ALERename"
    vim.keys(f":call cursor(4, 1)\\<CR>:{command}\\<CR>")
    # It asks for the name once the server has said what is renamed.
    vim.until("mode()", "c")
    vim.keys("\\<C-u>settle\\<CR>")
    assert vim.until("getline(4)", "settle(corner)") == "settle(corner)"
    assert vim.ask("getline(1)") == "from shop import Shop, settle"
    vim.keys(":silent! wall | edit shop.py\\<CR>")
    assert vim.until("getline(6)", "def settle(shop: Shop):") == "def settle(shop: Shop):"
