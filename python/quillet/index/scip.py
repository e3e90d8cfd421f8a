"""Writes an index in SCIP, the format by which code intelligence servers take in what a language says.

The message is an `Index`: metadata, then a `Document` a file with its occurrences and symbols. Files are bound as they
are now, so a document has every name in its place. A name of a module or class, and every class and function, is a
global symbol, described by the file's path and the scopes around; any other is local to the document. An attribute of
a method's first parameter belongs to the class where the class binds it, or a method sets it. A name that the file does
not bind is no occurrence: this index does not follow imports.
"""

from __future__ import annotations

import os
import re
from collections.abc import Callable, Iterator

from quillet._batch import analyze_files
from quillet._names import FileBindings, Occurrence, Symbol
from quillet.index.questions import Index
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
    inside = {}
    for row in index.files():
        full = index.full_path(row.path)
        path = _path_from(root, full)
        if path is None:
            skipped(full)
        else:
            inside[full] = path
    with analyze_files(inside, version=index.version, bindings=True) as results:
        for result, path in zip(results, inside.values(), strict=True):
            if result.problem is None:
                yield data(_INDEX_DOCUMENTS, _document(result.bindings, path))


def _path_from(root: str, full: str) -> str | None:
    path = os.path.relpath(full, root).replace(os.sep, "/")
    return None if path.startswith("../") or os.path.isabs(path) else path


def global_symbol(path: str, descriptors: str) -> str:
    """The symbol that descriptors tell in a file: `quillet . . . `, the path's own, and those."""
    return f"quillet . . . {''.join(_quoted(part) + '/' for part in path.split('/'))}{descriptors}"


def _quoted(name: str) -> str:
    return name if _IDENTIFIER.fullmatch(name) else "`" + name.replace("`", "``") + "`"


# The end of a descriptor and the kind of its symbol, by the kind of the definition.
_DESCRIBED = {"class": ("#", _KIND_CLASS), "function": ("().", _KIND_FUNCTION), "parameter": (".", _KIND_PARAMETER)}
_VARIABLE = (".", _KIND_VARIABLE)


class _Symbols:
    """The symbols of one file."""

    def __init__(self, path: str, bindings: FileBindings) -> None:
        self._path = path
        self._scopes = bindings.scopes
        self._occurrences = list(bindings.occurrences)
        # What a variable is: the kind of its first definition, where that is a class, function or parameter.
        self._defined: dict[Symbol, str] = {}
        for occurrence in self._occurrences:
            if occurrence.symbol is not None and occurrence.kind is not None:
                self._defined.setdefault(occurrence.symbol, occurrence.kind)
        self._of_classes = {
            (symbol.scope, symbol.name): symbol
            for symbol in self._defined
            if self._scopes[symbol.scope].kind == "class"
        }
        # The first parameters of methods, by which a class's own attributes are reached.
        self._selves: dict[Symbol, int] = {}
        with_first: set[int] = set()
        for occurrence in self._occurrences:
            if occurrence.kind == "parameter" and occurrence.scope not in with_first:
                with_first.add(occurrence.scope)
                around = self._scopes[occurrence.scope].parent
                if occurrence.symbol is not None and around is not None and self._scopes[around].kind == "class":
                    self._selves[occurrence.symbol] = around
        self._set_by_methods = {
            (self._selves[receiver], occurrence.text)
            for occurrence in self._occurrences
            if occurrence.role == "write" and (receiver := self._receiver(occurrence)) in self._selves
        }
        self._texts: dict[Symbol | tuple[int, str], str] = {}
        self.kinds: dict[str, tuple[int, str]] = {}

    def of(self, occurrence: Occurrence) -> str | None:
        """The symbol of an occurrence."""
        if occurrence.symbol is not None:
            return self._of_variable(occurrence.symbol)
        receiver = self._receiver(occurrence)
        if receiver not in self._selves:
            return None
        own = self._selves[receiver], occurrence.text
        if own in self._of_classes:
            return self._of_variable(self._of_classes[own])
        if own not in self._set_by_methods:
            return None
        if own not in self._texts:
            descriptors = self._descriptors(own[0]) + _quoted(own[1]) + "."
            self._add(own, global_symbol(self._path, descriptors), _KIND_VARIABLE, own[1])
        return self._texts[own]

    def _receiver(self, occurrence: Occurrence) -> Symbol | None:
        if occurrence.receiver is None or not occurrence.is_attribute:
            return None
        return self._occurrences[occurrence.receiver].symbol

    def _of_variable(self, variable: Symbol) -> str | None:
        if variable not in self._defined:
            return None
        if variable not in self._texts:
            defined = self._defined[variable]
            ending, kind = _DESCRIBED.get(defined, _VARIABLE)
            scope = self._scopes[variable.scope]
            if scope.kind == "class" and defined == "function":
                kind = _KIND_METHOD
            if scope.kind in ("module", "class") or defined in ("class", "function"):
                symbol = global_symbol(
                    self._path, f"{self._descriptors(variable.scope)}{_quoted(variable.name)}{ending}"
                )
            else:
                symbol = f"local {len(self._texts)}"
            self._add(variable, symbol, kind, variable.name)
        return self._texts[variable]

    def _add(self, key: Symbol | tuple[int, str], symbol: str, kind: int, name: str) -> None:
        self._texts[key] = symbol
        self.kinds.setdefault(symbol, (kind, name))

    def _descriptors(self, scope: int | None) -> str:
        """Those of the classes and functions from the module to a scope."""
        parts = []
        while scope is not None:
            at = self._scopes[scope]
            if at.kind in ("class", "function"):
                parts.append(_quoted(at.name) + _DESCRIBED[at.kind][0])
            scope = at.parent
        return "".join(reversed(parts))


def _roles_of(occurrence: Occurrence, is_first: bool) -> int:
    """What an occurrence does to its symbol. The first that binds it is its definition."""
    if occurrence.role in ("read", "call"):
        return _ROLE_READ
    if occurrence.role == "declaration":
        return 0
    roles = _ROLE_WRITE
    if is_first or occurrence.role == "definition":
        roles |= _ROLE_DEFINITION
    if occurrence.role == "import" or occurrence.kind == "import":
        roles |= _ROLE_IMPORT
    if "augmented" in occurrence.flags:
        roles |= _ROLE_READ
    return roles


def _document(bindings: FileBindings, path: str) -> bytes:
    symbols = _Symbols(path, bindings)
    out = [text(_DOCUMENT_PATH, path), text(_DOCUMENT_LANGUAGE, "Python")]
    bound: set[str] = set()
    for found in bindings.occurrences:
        symbol = symbols.of(found)
        if symbol is None:
            continue
        binds = found.role in ("definition", "write", "import")
        roles = _roles_of(found, binds and symbol not in bound)
        if binds:
            bound.add(symbol)
        place = integers(_OCCURRENCE_RANGE, [found.line - 1, found.column - 1, found.end_column - 1])
        occurrence = place + text(_OCCURRENCE_SYMBOL, symbol) + integer(_OCCURRENCE_ROLES, roles)
        out.append(data(_DOCUMENT_OCCURRENCES, occurrence))
    for symbol, (kind, name) in symbols.kinds.items():
        information = text(_SYMBOL_NAME, symbol) + integer(_SYMBOL_KIND, kind) + text(_SYMBOL_DISPLAY, name)
        out.append(data(_DOCUMENT_SYMBOLS, information))
    out.append(integer(_DOCUMENT_POSITIONS, _POSITIONS_UTF8))
    return b"".join(out)
