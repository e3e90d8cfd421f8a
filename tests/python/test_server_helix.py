"""The language server in Helix, which is driven by keys in a terminal of tmux's, read off its screen, and set up as
docs/editors.md says.
"""

from __future__ import annotations

import json
import os
import re
import shutil
import subprocess
import sys
import time
from collections.abc import Callable, Iterator
from pathlib import Path

import pytest

from editing import EDITORS, MAIN, SHOP

pytest.importorskip("pygls")
HELIX = shutil.which("hx") or shutil.which("helix")
if HELIX is None:
    pytest.skip("needs Helix (its package is hx in Debian)", allow_module_level=True)
TMUX = shutil.which("tmux")
if TMUX is None:
    pytest.skip("needs tmux (Debian: apt-get install tmux)", allow_module_level=True)


def set_up() -> str:
    """The languages.toml of the document, by the interpreter of this test."""
    [text] = re.findall(
        r"```toml\n(\[language-server\.quillet\].*?)```", EDITORS.read_text(encoding="utf-8"), re.DOTALL
    )
    named = 'command = "quillet"\nargs = ["serve"]'
    assert named in text
    command = f'command = {json.dumps(sys.executable)}\nargs = ["-m", "quillet", "serve"]'
    return text.replace(named, command)


class Helix:
    """A Helix in a terminal without a window, in whose place keys are pressed."""

    def __init__(self, folder: Path) -> None:
        settings = folder / "settings" / "helix"
        settings.mkdir(parents=True)
        (settings / "languages.toml").write_text(set_up())
        own = {"XDG_CONFIG_HOME": str(folder / "settings"), "XDG_CACHE_HOME": str(folder / "cache"), "TERM": "xterm"}
        self._environment = {**os.environ, **own}
        self._tmux = [str(TMUX), "-S", str(folder / "tmux"), "-f", os.devnull]
        self._run("new-session", "-d", "-x", "120", "-y", "30", "-c", str(folder), f"'{HELIX}' main.py")

    def _run(self, *arguments: str) -> str:
        done = subprocess.run(
            [*self._tmux, *arguments],
            env=self._environment,
            capture_output=True,
            text=True,
            timeout=60,
            check=False,
        )
        return done.stdout

    def type(self, text: str) -> None:
        """Presses the keys of letters."""
        self._run("send-keys", "-l", text)

    def press(self, *keys: str) -> None:
        """Presses keys by the names that tmux has for them."""
        self._run("send-keys", *keys)

    def leave(self) -> None:
        """Back to where keys are commands. An escape and a key behind it at once would be one key."""
        self.press("Escape")
        self.until(lambda screen: " NOR " in screen)

    def command(self, text: str) -> None:
        self.type(f":{text}")
        self.press("Enter")

    def until(self, wanted: Callable[[str], object], seconds: float = 60) -> str:
        """The screen, once it is as wanted."""
        deadline = time.monotonic() + seconds
        while True:
            screen = self._run("capture-pane", "-p")
            if wanted(screen) or time.monotonic() > deadline:
                return screen
            time.sleep(0.1)

    def until_written(self, path: Path, wanted: str) -> str:
        """The text of a file, once it is as wanted. There is none for a moment while it is written."""

        def text() -> str:
            try:
                return path.read_text()
            except FileNotFoundError:
                return ""

        self.until(lambda _: text() == wanted)
        return text()

    def close(self) -> None:
        self._run("kill-server")


@pytest.fixture
def folder(tmp_path: Path) -> Path:
    (tmp_path / "shop.py").write_text(SHOP)
    (tmp_path / "main.py").write_text(MAIN)
    (tmp_path / "pyproject.toml").write_text("[tool.quillet]\n")
    return tmp_path.resolve()


@pytest.fixture
def helix(folder: Path) -> Iterator[Helix]:
    editor = Helix(folder)
    try:
        assert "corner.total()" in editor.until(lambda screen: "corner.total()" in screen and " NOR " in screen)
        # The server is there once it tells of a problem.
        editor.type("gg3jOmissing_name")
        editor.leave()
        assert "nothing binds the name" in editor.until(lambda screen: "nothing binds the name" in screen)
        editor.type("u")
        assert "nothing binds" not in editor.until(lambda screen: "nothing binds" not in screen)
        yield editor
    finally:
        editor.close()


def test_problems_behind_a_keystroke(helix: Helix) -> None:
    helix.type("geoclass")
    helix.leave()
    assert "invalid syntax" in helix.until(lambda screen: "invalid syntax" in screen)
    helix.type("u")
    assert "invalid syntax" not in helix.until(lambda screen: "invalid syntax" not in screen)


def test_definition(helix: Helix) -> None:
    helix.type("gg3jgd")
    screen = helix.until(lambda screen: re.search(r"shop\.py .* 6:5\b", screen))
    assert re.search(r"shop\.py .* 6:5\b", screen), screen


def test_references(helix: Helix) -> None:
    helix.type("gg4jf.lgr")
    wanted = ("main.py:5", "shop.py:2", "shop.py:7")
    screen = helix.until(lambda screen: all(place in screen for place in wanted))
    assert [place for place in wanted if place not in screen] == []
    assert " 3/3 " in screen


def test_completion(helix: Helix, folder: Path) -> None:
    helix.type("geocorner.to")
    helix.press("C-x")  # asks at once, where the pause behind typing is not waited for
    assert "total method" in helix.until(lambda screen: "total method" in screen)
    helix.press("Tab")
    assert "def total(tax=0)" in helix.until(lambda screen: "def total(tax=0)" in screen)
    helix.press("Enter")
    helix.leave()
    helix.command("write")
    wanted = f"{MAIN}corner.total\n"
    assert helix.until_written(folder / "main.py", wanted) == wanted


def test_hover_says_what_it_is(helix: Helix) -> None:
    helix.type("gg3j k")
    assert "def pay(shop: Shop)" in helix.until(lambda screen: "def pay(shop: Shop)" in screen)


def test_rename_changes_all_files(helix: Helix, folder: Path) -> None:
    helix.type("gg3j r")
    helix.until(lambda screen: "rename-to:pay" in screen)
    helix.press("C-u")
    helix.type("settle")
    helix.press("Enter")
    assert "settle(corner)" in helix.until(lambda screen: "settle(corner)" in screen)
    helix.command("write-all")
    for name, text in (("shop.py", SHOP), ("main.py", MAIN)):
        wanted = text.replace("pay", "settle")
        assert helix.until_written(folder / name, wanted) == wanted
