"""Real projects as the measurements use them: their files, and the names that stand in them."""

from __future__ import annotations

import random
from collections.abc import Iterator
from pathlib import Path
from typing import NamedTuple

import quillet
from bench.truth.engine import Characters
from bench.truth.places import Cut, Place, ReadText

PLAIN, OWN, OTHER = "plain names", "self.x", "other attributes"
HOW_TO_GET = "pip download --no-deps --no-binary :all: django sympy, and unpack them"
_LEFT_OUT = {"__pycache__", "build", "dist", "node_modules", "site-packages"}


class Name(NamedTuple):
    """A name in a file. `group` says what it is taken from: nothing, `self`, or something else."""

    place: Place
    text: str
    group: str
    role: str
    kind: str | None
    scope_kind: str
    end: int


def SourceFiles(folder: Path) -> list[Path]:
    """The sources of a project, in the order of their paths."""
    return sorted(
        path
        for path in folder.rglob("*.py")
        if not _LEFT_OUT & set(path.relative_to(folder).parts[:-1]) and path.is_file() and not path.is_symlink()
    )


def Names(path: Path) -> Iterator[Name]:
    """The names of a file. Those in comments and strings are left out, and keywords of calls."""
    text = ReadText(path)
    bound = quillet.bind(text)
    lines = Cut(text)
    occurrences = bound.occurrences[:]
    scopes = bound.scopes
    for each in occurrences:
        if each.role in ("keyword", "declaration") or each.flags & {"comment", "string"}:
            continue
        group = PLAIN
        if each.is_attribute:
            receiver = None if each.receiver is None else occurrences[each.receiver]
            is_own = receiver is not None and receiver.text == "self" and not receiver.is_attribute
            group = OWN if is_own else OTHER
        line = lines[each.line - 1]
        place = Place(str(path), each.line, Characters(line, each.column))
        end = Characters(line, each.end_column)
        yield Name(place, each.text, group, each.role, each.kind, scopes[each.scope].kind, end)


def SampleNames(folder: Path, count: int, seed: int, groups: tuple[str, ...] = (PLAIN, OWN, OTHER)) -> list[Name]:
    """Names that are read or called, equally many of each group, ordered by their places."""
    pick = random.Random(seed)
    found: dict[str, list[Name]] = {group: [] for group in groups}
    for path in SourceFiles(folder):
        for name in Names(path):
            if name.role in ("read", "call") and name.group in found:
                found[name.group].append(name)
    share = count // len(groups)
    return sorted(
        (name for group in groups for name in pick.sample(found[group], min(share, len(found[group])))),
        key=lambda name: name.place,
    )
