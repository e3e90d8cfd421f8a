"""What helps to write: completion, and other names."""

from __future__ import annotations

from quillet.server.documents import uri_of
from quillet.server.features import feature
from quillet.server.language_server import Server
from quillet.server.positions import name_range, part_of, range_of
from quillet.server.protocol import RequestFailed
from quillet.server.reading import documentation

TYPE_CHECKING = False
if TYPE_CHECKING:
    from typing import Any

    from lsprotocol import types

# As the protocol numbers kinds of completions.
_KINDS = {
    "class": 7,
    "function": 3,
    "method": 2,
    "property": 10,
    "variable": 6,
    "parameter": 6,
    "module": 9,
    "keyword": 14,
    "attribute": 5,
}
_VARIABLE = _KINDS["variable"]


@feature("textDocument/completion", "completionProvider", {"triggerCharacters": ["."], "resolveProvider": True})
def completion(ls: Server, params: types.CompletionParams) -> Any:
    place = ls.place(params)
    # What an item says of itself is found when it is looked at.
    uri = params.text_document.uri
    ls.completed = (uri, ls.version_of(uri), place.line, place.column)
    ls.completion_number += 1
    items = []
    number, shown = ls.completion_number, place.settings.admitted
    for index, (name, kind, detail, _, certainty) in enumerate(place.workspace.complete(*place.at)):
        if certainty not in shown:
            continue
        item: dict[str, Any] = {
            "label": name,
            "kind": _KINDS.get(kind, _VARIABLE),
            "sortText": f"{index:05d}",
            "data": number,
        }
        if detail:
            item["detail"] = detail
        if certainty != "certain":
            item["labelDetails"] = {"description": certainty}
        items.append(item)
    return {"isIncomplete": False, "items": items}


@feature("completionItem/resolve")
def completion_resolve(ls: Server, item: dict[str, Any]) -> Any:
    if item.get("data") != ls.completion_number or ls.completed is None:
        return item
    uri, version, line, column = ls.completed
    if ls.version_of(uri) != version:  # the place is not what it was
        return item
    workspace, _, path = ls.file(uri)
    found = workspace.describe_completion(path, line, column, item["label"])
    if found is None:
        return item
    if found.text:
        item["detail"] = found.text
    if found.documentation:
        item["documentation"] = documentation(ls, found.documentation)
    return item


# ---- other names ----


@feature("textDocument/prepareRename")
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


@feature("textDocument/rename", "renameProvider", {"prepareProvider": True})
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
