"""What is wrong in a text: told behind every change of it, or when the client asks.

A client that can ask is told nothing. Problems of the other texts that are open are looked for again when a file comes,
goes or is saved.
"""

from __future__ import annotations

from quillet.server.documents import Document
from quillet.server.features import feature
from quillet.server.language_server import Server
from quillet.server.positions import range_of

TYPE_CHECKING = False
if TYPE_CHECKING:
    from typing import Any

    from lsprotocol import types

# As the protocol numbers severities.
_ERROR, _WARNING = 1, 2
# Behind the last change of another file.
_DELAY_OF_OTHERS = 0.3


def problems_of(ls: Server, uri: str) -> list[dict[str, Any]]:
    """The problems of a document that its project wants to see."""
    workspace, settings, path = ls.file(uri)
    if not settings.diagnostics:
        return []
    return [
        {
            "range": range_of(problem.line, problem.column, problem.end_line, problem.end_column),
            "severity": _ERROR if problem.code == "syntax" else _WARNING,
            "code": problem.code,
            "source": "quillet",
            "message": problem.message,
        }
        for problem in workspace.problems(path)
        if problem.code in settings.diagnostics
    ]


# ---- asked for ----


@feature(
    "textDocument/diagnostic",
    "diagnosticProvider",
    {"interFileDependencies": True, "workspaceDiagnostics": False, "identifier": "quillet"},
)
def diagnostic(ls: Server, params: types.DocumentDiagnosticParams) -> Any:
    items = problems_of(ls, params.text_document.uri)
    number = f"{hash(repr(items)) & 0xFFFFFFFFFFFF:x}"
    if params.previous_result_id == number:
        return {"kind": "unchanged", "resultId": number}
    return {"kind": "full", "resultId": number, "items": items}


# ---- told ----


def check(ls: Server, document: Document) -> None:
    """Tells the problems of a document once there is nothing else to do."""
    if document.is_python and not ls.pulls_diagnostics:
        ls.when_idle(f"problems of {document.uri}", lambda: _publish(ls, document))


def check_others(ls: Server) -> None:
    """The same for all documents, a little later: something beside them has changed."""
    ls.when_idle("problems of all", lambda: _check_all(ls), _DELAY_OF_OTHERS)


def forget(ls: Server, document: Document) -> None:
    """The client shows no problems of a document any more."""
    ls.work.drop(f"problems of {document.uri}")
    if document.is_python and not ls.pulls_diagnostics:
        _tell(ls, document, [])


def _check_all(ls: Server) -> None:
    if ls.pulls_diagnostics:
        if ls.refreshes_diagnostics:
            ls.protocol.ask("workspace/diagnostic/refresh")
        return
    for document in ls.documents:
        check(ls, document)


def _publish(ls: Server, document: Document) -> None:
    if ls.documents.get(document.uri) is document:
        _tell(ls, document, problems_of(ls, document.uri))


def _tell(ls: Server, document: Document, items: list[dict[str, Any]]) -> None:
    told = {"uri": document.uri, "version": document.version, "diagnostics": items}
    ls.protocol.tell("textDocument/publishDiagnostics", told)
