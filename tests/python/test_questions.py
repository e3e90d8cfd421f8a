"""The questions that people ask of a repository have the answers that `ast` gives, in their exact places."""

from __future__ import annotations

import json
import os
import subprocess
import sys
from pathlib import Path

import pytest

import ast_questions
from indexing import ENVIRONMENT
from quillet.index.questions import FLAGS, Folder, Query

# Everything that has a place of its own, and what is easily taken for it.
TRAPS = """
import os.path as p, json
from .shop.items import item as thing, Item
from . import shop
class Basket(Item, thing.Base[int], metaclass=Meta, key=1):
    size: int = 0
    def add(self, item, *, key=None):
        self.size += 1
        self.items(key).add(item).add(
            thing, key=key)
        (self
            .items(1)
            .size.real).append(Item.key)
        self.rows[key].size = super().add(self.rows[0].size)
        del self.rows, self.size.real
        raise thing.Lost(item) from self.size
@thing.wrap(key=2)
@Item.sort
def sort(items, /, *rest: Item) -> "Item":
    global item
    try:
        item, *rest = [key for key in items if key.size]
    except thing.Lost as item:
        raise
    except Lost:
        raise item or Lost
    match items:
        case Item(key=1) as thing:
            raise Item.lost(key)
        case {"a": key, **rest} | [key, *rest]:
            "".format(key).add(b"" b"".add)
    return lambda item, key=add(key): (yield item.add(key))
class Lost(Exception): add = sort = Basket.add
"""


def write_traps(folder: Path) -> None:
    (folder / "traps.py").write_text(TRAPS)
    (folder / "broken.py").write_text("add(\nBasket.add(key=\n")


@pytest.mark.parametrize("package", ["traps", "json", "asyncio", "email"])
def test_the_questions_have_the_answers_of_ast(package: str, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    if package == "traps":
        folder = tmp_path
        write_traps(folder)
    else:
        folder = Path(os.__file__).parent / package
    asked = ast_questions.ask(folder, 25)
    monkeypatch.chdir(folder)
    sources = Folder(".")
    flags = sum(1 << FLAGS.index(word) for word in ("comment", "string"))
    places = 0
    for title, (option, form) in ast_questions.QUESTIONS.items():
        for name, expected in asked["asked"][title].items():
            query = Query(
                f".{name}" if form == "." else name, "suffix" if form else "exact", (option,) if option else ()
            )
            found = {
                (os.fsdecode(hit.path), hit.line, hit.column)
                for hit in sources.find(query)
                if not hit.flags & flags and (option or hit.name == name)
            }
            found = {place for place in found if place[0] in asked["files"] and not in_string(place, asked)}
            wanted = {place for place in map(tuple, expected) if not in_string(place, asked)}
            assert found == wanted, (title, name)
            places += len(wanted)
    assert places > 50


def in_string(place: tuple[str, int, int], asked: dict) -> bool:
    path, *at = place
    return any([line, column] <= at <= [end, end_column] for line, column, end, end_column in asked["strings"][path])


def test_the_answers_of_ast_are_a_program_of_their_own(tmp_path: Path) -> None:
    write_traps(tmp_path)
    command = [sys.executable, ast_questions.__file__, str(tmp_path), "3"]
    result = subprocess.run(command, env=ENVIRONMENT, stdout=subprocess.PIPE, check=True)
    answers = json.loads(result.stdout)
    assert answers["files"] == ["traps.py"]
    assert sorted(answers["asked"]) == sorted(ast_questions.QUESTIONS)
    assert answers["asked"]["raisers"]["Lost"] == [["traps.py", 16, 15]]
