#!/usr/bin/env python3
"""Draws the pictures of docs/editors.md: the screen of Neovim with the language server, set up as it says there.

scripts/neovim_picture.py [FOLDER]

Neovim runs in a terminal of this script's, its keys are pressed, and what its screen holds in the end is drawn as it
is. Needs nvim, the command quillet and the package pyte.
"""

from __future__ import annotations

import fcntl
import html
import os
import pty
import re
import select
import struct
import subprocess
import sys
import tempfile
import termios
import time
from collections.abc import Sequence
from pathlib import Path

import pyte

ROOT = Path(__file__).resolve().parent.parent
COLUMNS, ROWS = 92, 17
SHOP = '''\
"""Things that are sold."""


class Basket:
    """What somebody wants to buy."""

    def __init__(self, limit: int = 10) -> None:
        self.items: list[float] = []
        self.limit = limit

    def total(self, tax: float = 0.19) -> float:
        """What all of it costs, with the tax on top."""
        return sum(self.items) * (1 + tax)
'''
MAIN = """\
from shop import Basket
import payments


def check_out(basket: Basket) -> float:
    price = basket.total(0.07)
    if price > most:
        raise ValueError(price)
    return price


check_out(Basket(limit=3))
"""
QUIET = b":set termguicolors noruler noshowcmd completeopt=menuone,noselect\r"
PICTURES = {
    # Look at what is wrong, then at `total`.
    "neovim.svg": (QUIET, b":call cursor(6, 22)\r", b":lua vim.lsp.buf.hover()\r"),
    # Write one more line.
    "neovim-completion.svg": (QUIET, b":call cursor(6, 1)\r", b"obasket.", b"\x18\x0f"),
    # Who uses `total`?
    "neovim-references.svg": (QUIET, b":call cursor(6, 22)\r", b":lua vim.lsp.buf.references()\r"),
}
LOOK = """
vim.cmd("colorscheme desert")
vim.cmd("hi Normal guibg=#1d2021 | hi NormalFloat guibg=#3c3836 | hi SignColumn guibg=#1d2021")
"""
NAMED = {
    "black": "1d2021", "red": "fb4934", "green": "b8bb26", "brown": "fabd2f", "blue": "83a598", "magenta": "d3869b",
    "cyan": "8ec07c", "white": "ebdbb2",
}  # fmt: skip
PAPER, INK = "1d2021", "ebdbb2"


def screen_of_neovim(folder: Path, all_keys: Sequence[bytes]) -> pyte.Screen:
    """The screen once the keys are pressed and nothing more is drawn."""
    screen = pyte.Screen(COLUMNS, ROWS)
    stream = pyte.ByteStream(screen)
    ours, theirs = pty.openpty()
    fcntl.ioctl(theirs, termios.TIOCSWINSZ, struct.pack("HHHH", ROWS, COLUMNS, 0, 0))
    environment = {**os.environ, "TERM": "xterm-256color", "COLORTERM": "truecolor"}
    editor = subprocess.Popen(
        ["nvim", "-n", "-u", "init.lua", "main.py"],
        cwd=folder,
        stdin=theirs,
        stdout=theirs,
        stderr=theirs,
        env=environment,
        start_new_session=True,
    )
    os.close(theirs)

    def draw(quiet: float) -> None:
        """Takes what is drawn until there is nothing more for so many seconds."""
        while select.select([ours], [], [], quiet)[0]:
            try:
                stream.feed(os.read(ours, 1 << 16))
            except OSError:
                return

    try:
        deadline = time.monotonic() + 60
        while not any("no module named" in line for line in screen.display) and time.monotonic() < deadline:
            draw(0.5)
        for keys in all_keys:
            os.write(ours, keys)
            draw(1.5)
    finally:
        editor.kill()
        editor.wait()
        os.close(ours)
    return screen


def colour(name: str, default: str) -> str:
    """A colour of a cell as six digits."""
    if name == "default":
        return default
    return name if re.fullmatch("[0-9a-f]{6}", name) else NAMED.get(name.removeprefix("bright"), default)


def svg(screen: pyte.Screen) -> str:
    """The cells of a screen: what has the same colours in a row is one text."""
    width, height = 8.4, 18
    parts = [
        f'<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {COLUMNS * width + 16:g} {ROWS * height + 16}" '
        'font-family="ui-monospace, Menlo, Consolas, monospace" font-size="14">',
        f'<rect width="100%" height="100%" rx="6" fill="#{PAPER}"/>',
    ]
    for row in range(ROWS):
        runs: list[tuple[int, str, tuple[str, str, bool]]] = []
        for column in range(COLUMNS):
            cell = screen.buffer[row][column]
            ink, paper = colour(cell.fg, INK), colour(cell.bg, PAPER)
            if cell.reverse:
                ink, paper = paper, ink
            look = (ink, paper, cell.bold)
            if runs and runs[-1][2] == look:
                begin, text, _ = runs[-1]
                runs[-1] = (begin, text + cell.data, look)
            else:
                runs.append((column, cell.data, look))
        for begin, text, (ink, paper, bold) in runs:
            left, top = 8 + begin * width, 8 + row * height
            if paper != PAPER:
                span = f'width="{len(text) * width:.1f}" height="{height}"'
                parts.append(f'<rect x="{left:.1f}" y="{top}" {span} fill="#{paper}"/>')
            if text.strip():
                weight = ' font-weight="bold"' if bold else ""
                parts.append(
                    f'<text x="{left:.1f}" y="{top + 13}" fill="#{ink}"{weight} xml:space="preserve" '
                    f'textLength="{len(text) * width:.1f}">{html.escape(text)}</text>'
                )
    return "\n".join([*parts, "</svg>", ""])


def main() -> int:
    """Runs the command."""
    target = Path(sys.argv[1]) if len(sys.argv) > 1 else ROOT / "docs" / "images"
    target.mkdir(parents=True, exist_ok=True)
    _, old = re.findall(r"```lua\n(.*?)```", (ROOT / "docs" / "editors.md").read_text(encoding="utf-8"), re.DOTALL)
    with tempfile.TemporaryDirectory() as name:
        folder = Path(name).resolve()
        (folder / "shop.py").write_text(SHOP)
        (folder / "main.py").write_text(MAIN)
        (folder / "init.lua").write_text(old + LOOK)
        for file, keys in PICTURES.items():
            screen = screen_of_neovim(folder, keys)
            (target / file).write_text(svg(screen), encoding="utf-8")
            print("\n".join(line.rstrip() for line in screen.display))
    return 0


if __name__ == "__main__":
    sys.exit(main())
