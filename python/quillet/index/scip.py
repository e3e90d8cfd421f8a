"""Writes an index in SCIP, the format by which code intelligence servers take in what a language says.

The message is an `Index`: metadata, then a `Document` a file with its occurrences and symbols. What a
file's modules, classes and functions set is a global symbol, described by the file's path and the scope;
what is set in a function is local to the document. A read refers to the nearest definition of its name
from its own scope outwards in the same file, classes around a function left out, as Python looks names
up. A read without one is no occurrence: this index does not follow imports.
"""

from __future__ import annotations

import os
import re
from collections.abc import Callable, Iterator

from quillet.index.questions import Hit, Index
from quillet.index.store import CLASS, FUNCTION
from quillet.index.wire import data, integer, integers, text

# Numbers of fields and enums of the format.
_INDEX_METADATA, _INDEX_DOCUMENTS = 1, 2
_METADATA_TOOL, _METADATA_ROOT, _METADATA_ENCODING = 2, 3, 4
_TOOL_NAME, _TOOL_VERSION = 1, 2
_TEXT_UTF8 = 1
_DOCUMENT_PATH, _DOCUMENT_OCCURRENCES, _DOCUMENT_SYMBOLS, _DOCUMENT_LANGUAGE, _DOCUMENT_POSITIONS = 1, 2, 3, 4, 6
_POSITIONS_UTF8 = 1
_OCCURRENCE_RANGE, _OCCURRENCE_SYMBOL, _OCCURRENCE_ROLES = 1, 2, 3
_ROLE_DEFINITION, _ROLE_IMPORT, _ROLE_WRITE, _ROLE_READ = 1, 2, 4, 8
_SYMBOL_NAME, _SYMBOL_KIND, _SYMBOL_DISPLAY = 1, 5, 6
_KIND_CLASS, _KIND_FUNCTION, _KIND_METHOD, _KIND_VARIABLE, _KIND_PARAMETER = 7, 17, 26, 61, 37

_IDENTIFIER = re.compile(r"[\w+$-]+", re.ASCII)


def scip_parts(index: Index, root: str, version: str, skipped: Callable[[str], None]) -> Iterator[bytes]:
    """The message in parts, a document each. Files outside `root` have no place in it and are skipped."""
    from pathlib import Path

    tool = text(_TOOL_NAME, "quillet") + text(_TOOL_VERSION, version)
    metadata = data(_METADATA_TOOL, tool) + text(_METADATA_ROOT, Path(root).as_uri())
    yield data(_INDEX_METADATA, metadata + integer(_METADATA_ENCODING, _TEXT_UTF8))
    inside = []
    for row in index.files():
        full = index.full_path(row.path)
        if _path_from(root, full) is None:
            skipped(full)
        else:
            inside.append(row)
    for facts in index.facts(inside):
        path = _path_from(root, index.full_path(facts.row.path))
        if path is not None:
            yield data(_INDEX_DOCUMENTS, _document(facts.hits, path))


def _path_from(root: str, full: str) -> str | None:
    path = os.path.relpath(full, root).replace(os.sep, "/")
    return None if path.startswith("../") or os.path.isabs(path) else path


def global_symbol(path: str, scopes: list[tuple[str, int]], name: str, opens: int) -> str:
    """The symbol of a name in a file: `quillet . . . ` and descriptors of the path, the scopes and the name."""
    parts = [_quoted(part) + "/" for part in path.split("/")]
    parts += [_descriptor(scope, kind) for scope, kind in scopes]
    return f"quillet . . . {''.join(parts)}{_descriptor(name, opens)}"


def _descriptor(name: str, opens: int) -> str:
    return _quoted(name) + {CLASS: "#", FUNCTION: "()."}.get(opens, ".")


def _quoted(name: str) -> str:
    return name if _IDENTIFIER.fullmatch(name) else "`" + name.replace("`", "``") + "`"


class _Symbols:
    """The symbols of one file, by scope and name."""

    def __init__(self, path: str, hits: list[Hit]) -> None:
        self._path = path
        self._opened: dict[str, int] = {"": 0}
        for hit in hits:
            if hit.opens:
                self._opened.setdefault(_inner(hit), hit.opens)
        self._defined: dict[tuple[str, str], str] = {}
        self.kinds: dict[str, tuple[int, str]] = {}
        self._locals = 0
        for hit in hits:
            if hit.kind == "set" and (hit.scope, hit.name) not in self._defined:
                self._define(hit)

    def _define(self, hit: Hit) -> None:
        in_class = self._opened.get(hit.scope) == CLASS
        if hit.is_parameter or (self._opened.get(hit.scope) == FUNCTION and not hit.opens):
            symbol = f"local {self._locals}"
            self._locals += 1
        else:
            symbol = global_symbol(self._path, self._scopes(hit.scope), hit.name, hit.opens)
        self._defined[hit.scope, hit.name] = symbol
        kind = _KIND_VARIABLE
        if hit.is_parameter:
            kind = _KIND_PARAMETER
        elif hit.opens:
            kind = _KIND_CLASS if hit.opens == CLASS else _KIND_METHOD if in_class else _KIND_FUNCTION
        self.kinds.setdefault(symbol, (kind, hit.name))

    def _scopes(self, scope: str) -> list[tuple[str, int]]:
        found = []
        at = scope
        while at:
            outer, _, name = at.rpartition(".")
            found.append((name, self._opened.get(at, FUNCTION)))
            at = outer
        return found[::-1]

    def resolve(self, scope: str, name: str) -> str | None:
        """The symbol that a name means in a scope."""
        symbol = self._defined.get((scope, name))
        while symbol is None and scope:
            scope = scope.rpartition(".")[0]
            if self._opened.get(scope) != CLASS:
                symbol = self._defined.get((scope, name))
        return symbol


def _inner(hit: Hit) -> str:
    return f"{hit.scope}.{hit.name}" if hit.scope else hit.name


def _document(hits: list[Hit], path: str) -> bytes:
    symbols = _Symbols(path, hits)
    roles: dict[tuple[int, int, int, str], int] = {}
    for hit in hits:
        role = {"set": _ROLE_DEFINITION | _ROLE_WRITE, "get": _ROLE_READ}.get(hit.kind)
        if hit.kind in ("import", "from_import"):
            role = _ROLE_IMPORT
        if role is None or "\n" in hit.name:
            continue
        symbol = symbols.resolve(hit.scope, hit.name)
        if symbol is not None:
            size = len(hit.name.encode("utf-8", "surrogatepass"))
            place = (hit.line - 1, hit.column - 1, hit.column - 1 + size, symbol)
            roles[place] = roles.get(place, 0) | role
    out = [text(_DOCUMENT_PATH, path), text(_DOCUMENT_LANGUAGE, "Python")]
    for (line, start, end, symbol), role in sorted(roles.items()):
        occurrence = integers(_OCCURRENCE_RANGE, [line, start, end]) + text(_OCCURRENCE_SYMBOL, symbol)
        out.append(data(_DOCUMENT_OCCURRENCES, occurrence + integer(_OCCURRENCE_ROLES, role)))
    for symbol, (kind, name) in symbols.kinds.items():
        information = text(_SYMBOL_NAME, symbol) + integer(_SYMBOL_KIND, kind) + text(_SYMBOL_DISPLAY, name)
        out.append(data(_DOCUMENT_SYMBOLS, information))
    out.append(integer(_DOCUMENT_POSITIONS, _POSITIONS_UTF8))
    return b"".join(out)
