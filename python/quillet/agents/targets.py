"""What a question is about: a path below the roots, and a place in it or a dotted name.

An agent knows names and lines; columns it counts badly. So a place may be a line and the name that stands there.
"""

from __future__ import annotations

import os
import re
from typing import NamedTuple

from quillet._workspace import Location, Workspace

# Definitions that a dotted name may mean, in the message that asks for one of them.
_NAMED_AT_MOST = 20


class QuestionError(ValueError):
    """A question cannot be answered as it was asked; the message says how it can."""


class Target(NamedTuple):
    """A place in a file, line and column from 1 and in UTF-8 bytes. `path` is absolute."""

    path: str
    line: int
    column: int


class Roots:
    """The folders that may be asked about, and how the paths in them are shown."""

    def __init__(self, roots: tuple[str, ...]) -> None:
        self._given = roots
        self._real = tuple(os.path.realpath(root) for root in roots)

    def path(self, text: str) -> str:
        """The absolute path of a file below the roots. Raises `QuestionError` for any other, and where none is."""
        if not text or "\0" in text:
            raise QuestionError("the path is empty" if not text else "a path holds no zero byte")
        candidates = [os.path.normpath(os.path.join(root, text)) for root in self._given]
        inside = [path for path in candidates if self._is_below(path)]
        if not inside:
            raise QuestionError(f"{text}: lies outside of the roots ({', '.join(self._given)})")
        for path in inside:
            if os.path.isfile(path):
                return path
        if os.path.isdir(inside[0]):
            raise QuestionError(f"{text}: is a folder; name a file")
        raise QuestionError(f"{text}: there is no such file below {', '.join(self._given)}")

    def shown(self, path: str) -> str:
        """A path as answers show it: from the root that it lies in, where there is but one root."""
        root = self._given[0]
        if len(self._given) == 1 and path.startswith(root.rstrip(os.sep) + os.sep):
            return os.path.relpath(path, root)
        return path

    def _is_below(self, path: str) -> bool:
        """Whether what a path leads to, by links as well, lies in a root."""
        real = os.path.realpath(path)
        return any(real == root or real.startswith(root.rstrip(os.sep) + os.sep) for root in self._real)


def place(workspace: Workspace, path: str, line: int, column: int | None, symbol: str | None) -> Target:
    """The place of a name in a line. Raises `QuestionError` where it does not stand there."""
    if line < 1 or (column is not None and column < 1):
        raise QuestionError("lines and columns count from 1")
    if column is not None:
        return Target(path, line, column)
    source = workspace.source_line(path, line).decode("utf-8", "surrogateescape")
    if symbol is None:
        # The first word is nearly always a keyword or what one does not mean.
        raise QuestionError("say which name of the line is meant: give `symbol`, or `column`")
    name = symbol.rsplit(".", 1)[-1]
    found = re.search(rf"(?<!\w){re.escape(name)}(?!\w)", source)
    if found is None:
        shown = source.strip()
        raise QuestionError(
            f"line {line} does not hold {name!r}; it is: {shown[:200]}" if shown else f"line {line} is empty"
        )
    return Target(path, line, len(source[: found.start()].encode("utf-8", "surrogateescape")) + 1)


def definitions_named(workspace: Workspace, symbol: str) -> list[Location]:
    """What the program defines by a dotted name. Raises `QuestionError` where that is nothing."""
    found = workspace.named(symbol)
    if found:
        return found
    near = workspace.symbols(symbol.rsplit(".", 1)[-1], limit=5)
    message = f"nothing is defined by the name {symbol!r}"
    if near:
        names = [f"{item.container}.{item.name}" if item.container else item.name for item in near]
        message += "; near are " + ", ".join(dict.fromkeys(names))
    raise QuestionError(message)


def only_one_named(workspace: Workspace, roots: Roots, symbol: str) -> Target:
    """The place of the definition that a dotted name means. Raises `QuestionError` where it means several things."""
    found = definitions_named(workspace, symbol)
    first = found[0]
    if len(found) > 1:
        same = {item[:3] for item in workspace.references(first.path, first.line, first.column, at_least="likely")}
        others = [item for item in found[1:] if item[:3] not in same]
        if others:
            listed = [f"{roots.shown(item.path)}:{item.line}" for item in [first, *others][:_NAMED_AT_MOST]]
            more = len(others) + 1 - len(listed)
            tail = f" and {more} more" if more else ""
            raise QuestionError(
                f"{symbol!r} names {len(others) + 1} definitions, at {', '.join(listed)}{tail}; "
                "give more of the dotted name, or `path` and `line`"
            )
    return Target(first.path, first.line, first.column)
