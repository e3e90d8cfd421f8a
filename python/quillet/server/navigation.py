"""Where things are: definitions, references, hierarchies of calls and of types, symbols of the program."""

from __future__ import annotations

from quillet._workspace import Call, Location, Workspace
from quillet.server.documents import path_of
from quillet.server.features import feature
from quillet.server.json_text import encode
from quillet.server.language_server import Place, Server
from quillet.server.positions import name_range, part_of, place_of
from quillet.server.protocol import Encoded
from quillet.settings import Settings

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterable
    from typing import Any

    from lsprotocol import types

# As the protocol numbers kinds of symbols.
SYMBOL_KINDS = {
    "module": 2,
    "class": 5,
    "function": 12,
    "method": 6,
    "variable": 13,
    "attribute": 8,
    "property": 7,
    "parameter": 13,
}
_MOST_SYMBOLS = 128


def _places(ls: Server, locations: Iterable[Location]) -> list[dict[str, Any]]:
    uris: dict[str, str] = {}
    places = []
    for at in locations:
        uri = uris.get(at.path)
        if uri is None:
            uri = uris[at.path] = ls.documents.uri_of(at.path)
        places.append({"uri": uri, "range": name_range(at)})
    return places


def _sure(settings: Settings, locations: Iterable[Location]) -> list[Location]:
    return [at for at in locations if settings.admits(at.certainty)]


# ---- from a name to where it comes from ----


@feature("textDocument/definition", "definitionProvider")
def definition(ls: Server, params: types.DefinitionParams) -> Any:
    place = ls.place(params)
    return _places(ls, place.workspace.definitions(*place.at, at_least=place.settings.certainty))


@feature("textDocument/declaration", "declarationProvider")
def declaration(ls: Server, params: types.DeclarationParams) -> Any:
    place = ls.place(params)
    return _places(ls, _sure(place.settings, place.workspace.declarations(*place.at)))


@feature("textDocument/typeDefinition", "typeDefinitionProvider")
def type_definition(ls: Server, params: types.TypeDefinitionParams) -> Any:
    place = ls.place(params)
    return _places(ls, _sure(place.settings, place.workspace.type_definitions(*place.at)))


@feature("textDocument/implementation", "implementationProvider")
def implementation(ls: Server, params: types.ImplementationParams) -> Any:
    place = ls.place(params)
    return _places(ls, _sure(place.settings, place.workspace.implementations(*place.at)))


@feature("textDocument/references", "referencesProvider", {"workDoneProgress": True})
def references(ls: Server, params: types.ReferenceParams) -> Any:
    place = ls.place(params)
    found = place.workspace.references(*place.at, at_least=place.settings.certainty)
    if not params.context.include_declaration:
        found = [at for at in found if at.role not in ("definition", "declaration", "module")]
    # Sorted by how sure they are, the files and lines in order among equals.
    found.sort(key=lambda at: _ORDER[at.certainty])
    return _places(ls, found)


_ORDER = {"certain": 0, "likely": 1, "by name": 2}
# As the protocol numbers kinds of highlights.
_READ, _WRITE = 2, 3


@feature("textDocument/documentHighlight", "documentHighlightProvider")
def highlight(ls: Server, params: types.DocumentHighlightParams) -> Any:
    place = ls.place(params)
    found = place.workspace.references(*place.at, at_least=place.settings.certainty, everywhere=False)
    return [
        {"range": name_range(at), "kind": _READ if at.role in ("read", "call", "keyword") else _WRITE} for at in found
    ]


# ---- symbols ----


@feature("workspace/symbol", "workspaceSymbolProvider", {"resolveProvider": False, "workDoneProgress": True})
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


@feature("textDocument/documentSymbol", "documentSymbolProvider")
def document_symbol(ls: Server, params: types.DocumentSymbolParams) -> Any:
    uri = params.text_document.uri
    document = ls.documents.get(uri)
    if document is not None and document.outline is not None:
        return Encoded(document.outline)
    workspace, _, path = ls.file(uri)
    outline = workspace.outline(path)
    answer = Encoded(encode(_symbols(outline) if ls.has_hierarchy else list(_flat_symbols(outline, uri, ""))))
    if document is not None:
        document.outline = answer
    return answer


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


@feature("textDocument/prepareCallHierarchy", "callHierarchyProvider")
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


@feature("callHierarchy/incomingCalls")
def incoming_calls(ls: Server, params: types.CallHierarchyIncomingCallsParams) -> Any:
    place = _asked(ls, params.item)
    return _calls(ls, place, "from", place.workspace.callers(*place.at))


@feature("callHierarchy/outgoingCalls")
def outgoing_calls(ls: Server, params: types.CallHierarchyOutgoingCallsParams) -> Any:
    place = _asked(ls, params.item)
    return _calls(ls, place, "to", place.workspace.callees(*place.at))


@feature("textDocument/prepareTypeHierarchy", "typeHierarchyProvider")
def prepare_type_hierarchy(ls: Server, params: types.TypeHierarchyPrepareParams) -> Any:
    return _prepare(ls, params, ("class",))


@feature("typeHierarchy/supertypes")
def supertypes(ls: Server, params: types.TypeHierarchySupertypesParams) -> Any:
    place = _asked(ls, params.item)
    return [_item(ls, place.workspace, at) for at in _sure(place.settings, place.workspace.supertypes(*place.at))]


@feature("typeHierarchy/subtypes")
def subtypes(ls: Server, params: types.TypeHierarchySubtypesParams) -> Any:
    place = _asked(ls, params.item)
    return [_item(ls, place.workspace, at) for at in _sure(place.settings, place.workspace.subtypes(*place.at))]
