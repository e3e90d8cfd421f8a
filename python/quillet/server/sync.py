"""What the client says of texts, files, folders and settings. Nothing of it is answered."""

from __future__ import annotations

import os

from quillet._workspace import Edit
from quillet.server import diagnostics, log
from quillet.server.documents import Document, path_of
from quillet.server.features import feature
from quillet.server.language_server import Server
from quillet.server.positions import place_of
from quillet.settings import PROJECT_FILE

TYPE_CHECKING = False
if TYPE_CHECKING:
    from typing import Any

    from lsprotocol import types

SECTION = "quillet"
_WATCHED = ("**/*.py", "**/*.pyi", f"**/{PROJECT_FILE}", "**/.gitignore", "**/pyvenv.cfg")


# ---- texts ----


@feature("textDocument/didOpen")
def did_open(ls: Server, params: types.DidOpenTextDocumentParams) -> None:
    opened = params.text_document
    path = path_of(opened.uri)
    is_python = opened.language_id == "python" or path.endswith((".py", ".pyi", ".pyw"))
    document = Document(opened.uri, path, opened.version, is_python)
    ls.open_document(document, opened.text)
    diagnostics.check(ls, document)


@feature("textDocument/didChange")
def did_change(ls: Server, params: types.DidChangeTextDocumentParams) -> None:
    document = ls.documents.get(params.text_document.uri)
    if document is None:
        log.warning("a change of what is not open: %s", params.text_document.uri)
        return
    document.version = params.text_document.version
    document.outline = None
    if not document.is_read:
        return
    path = document.path
    for change in params.content_changes:
        span = getattr(change, "range", None)
        for workspace in ls.projects.workspaces:
            if span is None:
                workspace.open(path, change.text)
            else:
                (line, column), (end_line, end_column) = place_of(span.start), place_of(span.end)
                workspace.change(path, [Edit(path, line, column, end_column, change.text, end_line)])
    diagnostics.check(ls, document)


@feature("textDocument/didClose")
def did_close(ls: Server, params: types.DidCloseTextDocumentParams) -> None:
    document = ls.documents.remove(params.text_document.uri)
    if document is None:
        return
    for workspace in ls.projects.workspaces:
        workspace.close(document.path)
    diagnostics.forget(ls, document)
    diagnostics.check_others(ls)


@feature("textDocument/didSave")
def did_save(ls: Server, params: types.DidSaveTextDocumentParams) -> None:
    if os.path.basename(path_of(params.text_document.uri)) == PROJECT_FILE:
        ls.projects.reload()
    diagnostics.check_others(ls)


# ---- files and folders ----


@feature("workspace/didChangeWatchedFiles")
def did_change_watched_files(ls: Server, params: types.DidChangeWatchedFilesParams) -> None:
    names = {os.path.basename(path_of(change.uri)) for change in params.changes}
    if names & {PROJECT_FILE, "pyvenv.cfg"}:
        ls.projects.reload()
    for workspace in ls.projects.workspaces:
        workspace.refresh()
    diagnostics.check_others(ls)


@feature("workspace/didChangeWorkspaceFolders")
def did_change_workspace_folders(ls: Server, params: types.DidChangeWorkspaceFoldersParams) -> None:
    added, removed = ([path_of(folder.uri) for folder in side] for side in (params.event.added, params.event.removed))
    ls.projects.change_folders(added, removed)
    diagnostics.check_others(ls)


def watch_files(ls: Server) -> None:
    """Asks the client to tell which files change, where it can."""
    watchers = [{"globPattern": pattern} for pattern in _WATCHED]
    registration = {
        "id": "quillet-files",
        "method": "workspace/didChangeWatchedFiles",
        "registerOptions": {"watchers": watchers},
    }
    ls.protocol.ask("client/registerCapability", {"registrations": [registration]})


# ---- settings ----


@feature("workspace/didChangeConfiguration")
def did_change_configuration(ls: Server, params: types.DidChangeConfigurationParams) -> None:
    if ls.has_configuration:
        ask_for_settings(ls)
    else:
        take_settings(ls, params.settings)


def ask_for_settings(ls: Server) -> None:
    """Asks the client for its settings, which then count."""
    ls.protocol.ask(
        "workspace/configuration",
        {"items": [{"section": SECTION}]},
        lambda answer: take_settings(ls, answer[0] if isinstance(answer, list) and answer else None),
    )


def take_settings(ls: Server, given: Any) -> None:
    """What the client says counts, by itself or as a section."""
    ls.projects.change_client(own_settings(given))
    diagnostics.check_others(ls)


def own_settings(given: Any) -> dict[str, Any]:
    """The settings among what a client has."""
    if isinstance(given, dict) and isinstance(given.get(SECTION), dict):
        given = given[SECTION]
    return {key: value for key, value in given.items() if value is not None} if isinstance(given, dict) else {}
