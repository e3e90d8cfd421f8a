"""What the tests of the index share: the command as a process, and folders of source."""

from __future__ import annotations

import json
import os
import subprocess
import sys
from collections.abc import Sequence
from pathlib import Path

from quillet.index.questions import Index
from quillet.index.store import read_index
from quillet.tarvex import _host

ENVIRONMENT = {**os.environ, "PYTHONUTF8": "1", "NO_COLOR": "1"}
COMMAND = [sys.executable, "-m", "quillet"]

SHOP = """\
import os.path
from decimal import Decimal as D

LIMIT: int = 10


class Item:
    price = D(0)

    def __init__(self, price: D) -> None:
        self.price = price


class Shop:
    def add(self, item: Item, count=1):
        for one in range(count):
            self.items.append(item)
        return self.items

    def path(self, name):
        return os.path.join('shop', name)


def main():
    shop = Shop()
    shop.add(Item(D(3)), 2)
"""

ODD_NAMES = ["new\nline.py", "quote\"'.py", "..py.py", "<script>a(1)<.py", "tab\there.py", "back\\slash.py", b"\xff.py"]


def run(*arguments: str | Path, cwd: Path, front: Sequence[str] = ()) -> subprocess.CompletedProcess[str]:
    return subprocess.run(
        [*front, *COMMAND, *map(str, arguments)],
        capture_output=True,
        cwd=cwd,
        env=ENVIRONMENT,
        timeout=120,
        check=False,
        encoding="utf-8",
        errors="surrogateescape",
    )


def make_index(folder: Path, **files: str) -> None:
    """Writes `name.py` for each keyword, and indexes the folder."""
    for name, text in files.items():
        (folder / f"{name}.py").write_text(text, encoding="utf-8")
    result = run("index", ".", "-q", cwd=folder)
    assert result.returncode == 0, result.stderr


def content(index: Path, *roots: str | Path) -> dict[bytes, list[object]]:
    """All that an index says, by file: to compare two indexes that were made by different ways."""
    native = read_index(str(index)).native
    with Index(str(index), [str(root) for root in roots]) as opened:
        return {
            facts.row.path: [facts.row[4:], facts.hits, facts.errors, words_of(native, facts.row.number)]
            for facts in opened.facts(opened.files())
        }


def words_of(native: _host.NameIndex, number: int) -> list[tuple[str, int]]:
    """The words of a file and their uses."""
    return sorted(native.WordsOf(number))


def found(*arguments: str, cwd: Path) -> list[str]:
    """The places that `quillet find` names, as line:column of the one file there is."""
    result = run("find", "--json", *arguments, cwd=cwd)
    rows = [json.loads(line) for line in result.stdout.splitlines()]
    assert result.returncode == (0 if rows else 1), result.stderr
    return list(dict.fromkeys(f"{row['line']}:{row['column']}" for row in rows))
