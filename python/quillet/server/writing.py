"""What helps to write: completion, and other names."""

from __future__ import annotations

from typing import Any

from lsprotocol import types

from quillet.server.documents import uri_of
from quillet.server.features import feature
from quillet.server.language_server import Server
from quillet.server.positions import name_range, part_of, place_of, range_of
from quillet.server.protocol import RequestFailed
from quillet.server.reading import documentation

_KINDS = {
    "class": types.CompletionItemKind.Class.value,
    "function": types.CompletionItemKind.Function.value,
    "method": types.CompletionItemKind.Method.value,
    "property": types.CompletionItemKind.Property.value,
    "variable": types.CompletionItemKind.Variable.value,
    "parameter": types.CompletionItemKind.Variable.value,
    "module": types.CompletionItemKind.Module.value,
    "keyword": types.CompletionItemKind.Keyword.value,
    "attribute": types.CompletionItemKind.Field.value,
}


@feature(types.TEXT_DOCUMENT_COMPLETION, types.CompletionOptions(trigger_characters=["."], resolve_provider=True))
def completion(ls: Server, params: types.CompletionParams) -> Any:
    place = ls.place(params)
    # What an item says of itself is found when it is looked at.
    ls.completed = (params.text_document.uri, ls.version_of(params.text_document.uri), params.position)
    ls.completion_number += 1
    items = []
    for index, each in enumerate(place.workspace.complete(*place.at)):
        if not place.settings.admits(each.certainty):
            continue
        item: dict[str, Any] = {
            "label": each.name,
            "kind": _KINDS.get(each.kind, _KINDS["variable"]),
            "sortText": f"{index:05d}",
            "data": ls.completion_number,
        }
        if each.detail:
            item["detail"] = each.detail
        if each.certainty != "certain":
            item["labelDetails"] = {"description": each.certainty}
        items.append(item)
    return {"isIncomplete": False, "items": items}


@feature(types.COMPLETION_ITEM_RESOLVE)
def completion_resolve(ls: Server, item: types.CompletionItem) -> Any:
    if item.data != ls.completion_number or ls.completed is None:
        return item
    uri, version, position = ls.completed
    if ls.version_of(uri) != version:  # the place is not what it was
        return item
    workspace, _, path = ls.file(uri)
    found = workspace.describe_completion(path, *place_of(position), item.label)
    if found is None:
        return item
    if found.text:
        item.detail = found.text
    if found.documentation:
        markup = documentation(ls, found.documentation)
        item.documentation = types.MarkupContent(kind=types.MarkupKind(markup["kind"]), value=markup["value"])
    return item


# ---- other names ----


@feature(types.TEXT_DOCUMENT_PREPARE_RENAME)
def prepare_rename(ls: Server, params: types.PrepareRenameParams) -> Any:
    place = ls.place(params)
    here = [
        at
        for at in place.workspace.references(*place.at, everywhere=False)
        if at.path == place.path and at.line == place.line and at.column <= place.column <= at.end_column
    ]
    if not here:
        return None
    defined = place.workspace.definitions(*place.at)
    if defined and not any(ls.projects.holds(at.path) for at in defined):
        raise RequestFailed("what has this name is defined outside of the program")
    at = here[0]
    line = place.workspace.source_line(place.path, at.line).decode("utf-8", "replace")
    return {"range": name_range(at), "placeholder": part_of(line, at.column, at.end_column, ls.projects.columns)}


@feature(types.TEXT_DOCUMENT_RENAME, types.RenameOptions(prepare_provider=True))
def rename(ls: Server, params: types.RenameParams) -> Any:
    place = ls.place(params)
    changes: dict[str, list[dict[str, Any]]] = {}
    for edit in place.workspace.rename(*place.at, params.new_name):
        end_line = edit.line if edit.end_line is None else edit.end_line
        changes.setdefault(edit.path, []).append(
            {"range": range_of(edit.line, edit.column, end_line, edit.end_column), "newText": edit.text}
        )
    if not ls.has_versions:
        return {"changes": {ls.documents.uri_of(path): edits for path, edits in changes.items()}}
    answer = []
    for path, edits in changes.items():
        document = ls.documents.at(path)
        name: dict[str, Any] = {"uri": uri_of(path), "version": None}
        if document is not None:
            name = {"uri": document.uri, "version": document.version}
        answer.append({"textDocument": name, "edits": edits})
    return {"documentChanges": answer}
