"""Where things are: definitions, references, hierarchies of calls and of types, symbols of the program."""

from __future__ import annotations

from collections.abc import Iterable
from typing import Any

from lsprotocol import types

from quillet._workspace import Call, Location, Workspace
from quillet.server.documents import path_of
from quillet.server.features import feature
from quillet.server.language_server import Place, Server
from quillet.server.positions import name_range, part_of, place_of
from quillet.settings import Settings

SYMBOL_KINDS = {
    "module": types.SymbolKind.Module.value,
    "class": types.SymbolKind.Class.value,
    "function": types.SymbolKind.Function.value,
    "method": types.SymbolKind.Method.value,
    "variable": types.SymbolKind.Variable.value,
    "attribute": types.SymbolKind.Field.value,
    "property": types.SymbolKind.Property.value,
    "parameter": types.SymbolKind.Variable.value,
}
_MOST_SYMBOLS = 300


def _places(ls: Server, locations: Iterable[Location]) -> list[dict[str, Any]]:
    uri_of = ls.documents.uri_of
    return [{"uri": uri_of(at.path), "range": name_range(at)} for at in locations]


def _sure(settings: Settings, locations: Iterable[Location]) -> list[Location]:
    return [at for at in locations if settings.admits(at.certainty)]


# ---- from a name to where it comes from ----


@feature(types.TEXT_DOCUMENT_DEFINITION)
def definition(ls: Server, params: types.DefinitionParams) -> Any:
    place = ls.place(params)
    return _places(ls, place.workspace.definitions(*place.at, at_least=place.settings.certainty))


@feature(types.TEXT_DOCUMENT_DECLARATION)
def declaration(ls: Server, params: types.DeclarationParams) -> Any:
    place = ls.place(params)
    return _places(ls, _sure(place.settings, place.workspace.declarations(*place.at)))


@feature(types.TEXT_DOCUMENT_TYPE_DEFINITION)
def type_definition(ls: Server, params: types.TypeDefinitionParams) -> Any:
    place = ls.place(params)
    return _places(ls, _sure(place.settings, place.workspace.type_definitions(*place.at)))


@feature(types.TEXT_DOCUMENT_IMPLEMENTATION)
def implementation(ls: Server, params: types.ImplementationParams) -> Any:
    place = ls.place(params)
    return _places(ls, _sure(place.settings, place.workspace.implementations(*place.at)))


@feature(types.TEXT_DOCUMENT_REFERENCES, types.ReferenceOptions(work_done_progress=True))
def references(ls: Server, params: types.ReferenceParams) -> Any:
    place = ls.place(params)
    found = place.workspace.references(*place.at, at_least=place.settings.certainty)
    if not params.context.include_declaration:
        found = [at for at in found if at.role not in ("definition", "declaration", "module")]
    # Sorted by how sure they are, the files and lines in order among equals.
    found.sort(key=lambda at: _ORDER[at.certainty])
    return _places(ls, found)


_ORDER = {"certain": 0, "likely": 1, "by name": 2}
_READ, _WRITE = types.DocumentHighlightKind.Read.value, types.DocumentHighlightKind.Write.value


@feature(types.TEXT_DOCUMENT_DOCUMENT_HIGHLIGHT)
def highlight(ls: Server, params: types.DocumentHighlightParams) -> Any:
    place = ls.place(params)
    found = place.workspace.references(*place.at, at_least=place.settings.certainty, everywhere=False)
    return [
        {"range": name_range(at), "kind": _READ if at.role in ("read", "call", "keyword") else _WRITE} for at in found
    ]


# ---- symbols ----


@feature(types.WORKSPACE_SYMBOL, types.WorkspaceSymbolOptions(work_done_progress=True))
def workspace_symbol(ls: Server, params: types.WorkspaceSymbolParams) -> Any:
    uri_of = ls.documents.uri_of
    return [
        {
            "name": symbol.name,
            "kind": SYMBOL_KINDS.get(symbol.kind, SYMBOL_KINDS["variable"]),
            "containerName": symbol.container,
            "location": {"uri": uri_of(symbol.path), "range": name_range(symbol)},
        }
        for workspace in ls.projects.workspaces
        for symbol in workspace.symbols(params.query, limit=_MOST_SYMBOLS)
    ]


@feature(types.TEXT_DOCUMENT_DOCUMENT_SYMBOL)
def document_symbol(ls: Server, params: types.DocumentSymbolParams) -> Any:
    workspace, _, path = ls.file(params.text_document.uri)
    outline = workspace.outline(path)
    if ls.has_hierarchy:
        return _symbols(outline)
    return list(_flat_symbols(outline, params.text_document.uri, ""))


def _symbols(items: Iterable[Any]) -> list[dict[str, Any]]:
    symbols = []
    for item in items:
        symbol = {
            "name": item.name,
            "kind": SYMBOL_KINDS.get(item.kind, SYMBOL_KINDS["variable"]),
            "range": _whole(item),
            "selectionRange": name_range(item),
        }
        if item.detail:
            symbol["detail"] = item.detail
        if item.children:
            symbol["children"] = _symbols(item.children)
        symbols.append(symbol)
    return symbols


def _flat_symbols(items: Iterable[Any], uri: str, container: str) -> Iterable[dict[str, Any]]:
    for item in items:
        yield {
            "name": item.name,
            "kind": SYMBOL_KINDS.get(item.kind, SYMBOL_KINDS["variable"]),
            "location": {"uri": uri, "range": _whole(item)},
            "containerName": container,
        }
        yield from _flat_symbols(item.children, uri, item.name)


def _whole(item: Any) -> dict[str, Any]:
    return {
        "start": {"line": item.first_line - 1, "character": item.first_column - 1},
        "end": {"line": item.last_line - 1, "character": item.last_column - 1},
    }


# ---- hierarchies ----


def _item(ls: Server, workspace: Workspace, at: Location | Call, name: str = "", detail: str = "") -> dict[str, Any]:
    if not name:
        line = workspace.source_line(at.path, at.line).decode("utf-8", "replace")
        name = part_of(line, at.column, at.end_column, ls.projects.columns)
    item = {
        "name": name or at.path,
        "kind": SYMBOL_KINDS.get(at.kind or "", SYMBOL_KINDS["function"]),
        "uri": ls.documents.uri_of(at.path),
        "range": name_range(at),
        "selectionRange": name_range(at),
    }
    if detail:
        item["detail"] = detail
    return item


def _asked(ls: Server, item: Any) -> Place:
    path = path_of(item.uri)
    project = ls.projects.of(path)
    return Place(project.workspace, project.settings, path, *place_of(item.selection_range.start))


def _prepare(ls: Server, params: Any, kinds: tuple[str, ...]) -> Any:
    place = ls.place(params)
    found = place.workspace.definitions(*place.at, at_least=place.settings.certainty)
    return [_item(ls, place.workspace, at) for at in found if at.kind in kinds] or None


@feature(types.TEXT_DOCUMENT_PREPARE_CALL_HIERARCHY)
def prepare_call_hierarchy(ls: Server, params: types.CallHierarchyPrepareParams) -> Any:
    return _prepare(ls, params, ("function", "class"))


def _calls(ls: Server, place: Place, end: str, calls: Iterable[Call]) -> Any:
    answer = []
    for call in calls:
        if not place.settings.admits(call.certainty):
            continue
        container, _, name = call.name.rpartition(".")
        detail = container if call.certainty == "certain" else f"{container} ({call.certainty})"
        item = _item(ls, place.workspace, call, name or call.name, detail)
        answer.append({end: item, "fromRanges": [name_range(at) for at in _sure(place.settings, call.calls)]})
    return answer


@feature(types.CALL_HIERARCHY_INCOMING_CALLS)
def incoming_calls(ls: Server, params: types.CallHierarchyIncomingCallsParams) -> Any:
    place = _asked(ls, params.item)
    return _calls(ls, place, "from", place.workspace.callers(*place.at))


@feature(types.CALL_HIERARCHY_OUTGOING_CALLS)
def outgoing_calls(ls: Server, params: types.CallHierarchyOutgoingCallsParams) -> Any:
    place = _asked(ls, params.item)
    return _calls(ls, place, "to", place.workspace.callees(*place.at))


@feature(types.TEXT_DOCUMENT_PREPARE_TYPE_HIERARCHY)
def prepare_type_hierarchy(ls: Server, params: types.TypeHierarchyPrepareParams) -> Any:
    return _prepare(ls, params, ("class",))


@feature(types.TYPE_HIERARCHY_SUPERTYPES)
def supertypes(ls: Server, params: types.TypeHierarchySupertypesParams) -> Any:
    place = _asked(ls, params.item)
    return [_item(ls, place.workspace, at) for at in _sure(place.settings, place.workspace.supertypes(*place.at))]


@feature(types.TYPE_HIERARCHY_SUBTYPES)
def subtypes(ls: Server, params: types.TypeHierarchySubtypesParams) -> Any:
    place = _asked(ls, params.item)
    return [_item(ls, place.workspace, at) for at in _sure(place.settings, place.workspace.subtypes(*place.at))]
