"""What the language server reads and says by itself, beside what the libraries that know the protocol do."""

from __future__ import annotations

import subprocess
import sys
from pathlib import Path
from types import SimpleNamespace
from typing import Any

import pytest

pytest.importorskip("pygls")

from cattrs.errors import BaseValidationError
from lsprotocol import converters, types
from pygls.capabilities import ServerCapabilitiesBuilder

from quillet.server import diagnostics, language_server, navigation, params, reading, writing
from quillet.server.library import read_params
from quillet.server.main import FEATURES
from serving import CAPABILITIES, Client

URI = "file:///project/a%20b.py"
PLACE = {"line": 3, "character": 2**31 - 1}
SPAN = {"start": {"line": 0, "character": 0}, "end": PLACE}
DOCUMENT = {"textDocument": {"uri": URI}}
ITEM = {"item": {"name": "f", "kind": 12, "uri": URI, "range": SPAN, "selectionRange": SPAN, "data": [1]}}
# A message of each kind that is read without the libraries, as editors send it.
MESSAGES: dict[str, Any] = {
    "textDocument/didOpen": {"textDocument": {"uri": URI, "languageId": "python", "version": 1, "text": "é"}},
    "textDocument/didChange": {
        "textDocument": {"uri": URI, "version": 2},
        "contentChanges": [{"range": SPAN, "rangeLength": 1, "text": "x"}, {"text": "whole"}],
    },
    "textDocument/didClose": DOCUMENT,
    "textDocument/didSave": {**DOCUMENT, "text": "whole"},
    "textDocument/references": {**DOCUMENT, "position": PLACE, "context": {"includeDeclaration": True}},
    "textDocument/rename": {**DOCUMENT, "position": PLACE, "newName": "other"},
    "textDocument/documentSymbol": {**DOCUMENT, "workDoneToken": "t"},
    "textDocument/foldingRange": DOCUMENT,
    "textDocument/semanticTokens/full": DOCUMENT,
    "textDocument/semanticTokens/range": {**DOCUMENT, "range": SPAN},
    "textDocument/inlayHint": {**DOCUMENT, "range": SPAN},
    "textDocument/selectionRange": {**DOCUMENT, "positions": [PLACE, PLACE]},
    "textDocument/diagnostic": {**DOCUMENT, "previousResultId": "7"},
    "completionItem/resolve": {"label": "name", "data": 3, "kind": 2},
    "workspace/symbol": {"query": "é"},
    "workspace/didChangeConfiguration": {"settings": {"quillet": {"version": "2.7"}}},
    "workspace/didChangeWatchedFiles": {"changes": [{"uri": URI, "type": 2}]},
    "initialize": {"processId": None, "rootUri": None, "capabilities": {}},
    **dict.fromkeys(
        (
            "callHierarchy/incomingCalls", "callHierarchy/outgoingCalls", "typeHierarchy/supertypes",
            "typeHierarchy/subtypes",
        ),
        ITEM,
    ),
    **{
        f"textDocument/{name}": {**DOCUMENT, "position": PLACE}
        for name in (
            "completion", "hover", "signatureHelp", "definition", "declaration", "typeDefinition", "implementation",
            "documentHighlight", "prepareRename", "prepareCallHierarchy", "prepareTypeHierarchy",
        )
    },
}  # fmt: skip


def compare(ours: Any, theirs: Any) -> None:
    """What is read here is a part of what the library reads."""
    if isinstance(ours, SimpleNamespace):
        for name, value in vars(ours).items():
            compare(value, getattr(theirs, name, None))
    elif isinstance(ours, list):
        assert len(ours) == len(theirs)
        for one, other in zip(ours, theirs, strict=True):
            compare(one, other)
    else:
        assert ours == theirs


def variants(value: Any) -> list[Any]:
    """A message with one thing after the other left out or of another kind."""
    made: list[Any] = ["text", 5, None, [], True] if not isinstance(value, (dict, list)) else ["text", 5, None]
    if isinstance(value, dict):
        for key, inner in value.items():
            made.append({name: each for name, each in value.items() if name != key})
            made.extend({**value, key: other} for other in variants(inner))
    if isinstance(value, list) and value:
        made.extend([other, *value[1:]] for other in variants(value[0]))
    return made


def test_all_that_is_read_here_is_tried() -> None:
    assert set(params._PLAIN) == set(MESSAGES)
    assert set(MESSAGES) <= {*FEATURES, "initialize"}


@pytest.mark.parametrize("method", list(MESSAGES))
def test_messages_are_read_as_the_library_reads_them(method: str, monkeypatch: pytest.MonkeyPatch) -> None:
    library = read_params(method, MESSAGES[method])
    with monkeypatch.context() as patch:
        patch.setitem(sys.modules, "quillet.server.library", None)  # which must not be needed
        ours = params.read(method, MESSAGES[method])
    if isinstance(ours, SimpleNamespace):
        compare(ours, library)
    else:
        assert ours is MESSAGES[method]
    # What is wrong is left to the library, unless no answer looks at it; what both read they read alike.
    refused = 0
    for message in variants(MESSAGES[method]):
        try:
            theirs = read_params(method, message)
        except Exception:
            refused += 1
            continue
        ours = params.read(method, message)
        if isinstance(ours, SimpleNamespace):
            compare(ours, theirs)
    assert refused


def test_wrong_parameters_are_refused_by_the_library() -> None:
    for method, wrong in (
        ("textDocument/hover", {"textDocument": {"uri": 5}, "position": {"line": "x"}}),
        ("textDocument/hover", None),
        ("textDocument/definition", {**DOCUMENT, "position": {"line": -1, "character": 0}}),
        ("textDocument/didChange", {"textDocument": {"uri": URI, "version": 1}, "contentChanges": 5}),
        ("completionItem/resolve", {"data": 1}),
        ("initialize", {"capabilities": 5}),
        ("workspace/didChangeWorkspaceFolders", {"event": {}}),
    ):
        with pytest.raises(BaseValidationError):
            params.read(method, wrong)


@pytest.mark.parametrize("prepares", [True, False])
@pytest.mark.parametrize("encodings", [["utf-16"], ["utf-9", "utf-8", "utf-16"], ["utf-32"], [], None])
def test_it_says_that_it_can_what_pygls_would_say(tmp_path: Path, prepares: bool, encodings: list[str] | None) -> None:
    can: dict[str, Any] = {**CAPABILITIES, "general": {} if encodings is None else {"positionEncodings": encodings}}
    can["textDocument"] = {**CAPABILITIES["textDocument"], "rename": {"prepareSupport": prepares}}
    converter = converters.get_converter()
    kinds = {
        "textDocument/completion": types.CompletionOptions,
        "textDocument/signatureHelp": types.SignatureHelpOptions,
        "textDocument/references": types.ReferenceOptions,
        "workspace/symbol": types.WorkspaceSymbolOptions,
        "textDocument/rename": types.RenameOptions,
        "textDocument/diagnostic": types.DiagnosticOptions,
    }
    with Client(tmp_path.resolve(), initialize=False) as client:
        ours = client.Initialize(can)["capabilities"]
    providers = {
        "textDocument/completion": "completionProvider",
        "textDocument/signatureHelp": "signatureHelpProvider",
        "textDocument/references": "referencesProvider",
        "workspace/symbol": "workspaceSymbolProvider",
        "textDocument/diagnostic": "diagnosticProvider",
    }
    options: dict[str, Any] = {
        method: converter.structure(ours[provider], kinds[method]) for method, provider in providers.items()
    }
    legend = converter.structure(ours["semanticTokensProvider"]["legend"], types.SemanticTokensLegend)
    options["textDocument/semanticTokens/full"] = legend
    structured = converter.structure(can, types.ClientCapabilities)
    built = ServerCapabilitiesBuilder(
        structured,
        set(FEATURES),
        options,
        [],
        types.TextDocumentSyncKind.Incremental,
        None,
        ServerCapabilitiesBuilder.choose_position_encoding(structured),
    ).build()
    theirs = converter.unstructure(built)
    # There are no commands and no operations on files; what is left out is no.
    del theirs["executeCommandProvider"], theirs["workspace"]["fileOperations"]
    assert {key: value for key, value in theirs["textDocumentSync"].items() if value} == ours["textDocumentSync"]
    assert {**theirs, "textDocumentSync": None} == {**ours, "textDocumentSync": None}


def test_numbers_are_those_of_the_protocol() -> None:
    kinds = {
        **types.SymbolKind.__members__,
        "Attribute": types.SymbolKind.Field,
        "Parameter": types.SymbolKind.Variable,
    }
    assert {name: kinds[name.title()].value for name in navigation.SYMBOL_KINDS} == navigation.SYMBOL_KINDS
    items = types.CompletionItemKind.__members__
    items = {**items, "Attribute": types.CompletionItemKind.Field, "Parameter": types.CompletionItemKind.Variable}
    assert {name: items[name.title()].value for name in writing._KINDS} == writing._KINDS
    assert (types.DocumentHighlightKind.Read, types.DocumentHighlightKind.Write) == (
        navigation._READ,
        navigation._WRITE,
    )
    assert (types.InlayHintKind.Type, types.InlayHintKind.Parameter) == (reading._TYPE, reading._PARAMETER)
    severities = types.DiagnosticSeverity.Error, types.DiagnosticSeverity.Warning
    assert severities == (diagnostics._ERROR, diagnostics._WARNING)
    assert types.MessageType.Error == language_server._ERROR


def test_a_first_answer_needs_no_library(tmp_path: Path) -> None:
    """Loading them takes ten times as long as all else."""
    said = tmp_path / "loaded"
    program = (
        "import sys, atexit\n"
        "from quillet.server.main import serve\n"
        "code = serve()\n"
        f"open({str(said)!r}, 'w').write(' '.join(name for name in sys.modules if '.' not in name))\n"
    )
    (tmp_path / "a.py").write_text("def here(): pass\nhere()\n")
    with Client(tmp_path.resolve(), command=[sys.executable, "-c", program]) as client:
        client.open("a.py")
        assert client.shown(client.ask("definition", "a.py", "here()\n")) == ["a.py:0:4-8"]
        assert client.diagnostics("a.py") == []
        [symbol] = client.Ask("workspace/symbol", {"query": "here"})
        assert symbol["name"] == "here"
        client.Ask("shutdown", None)
        client.Tell("exit", None)
        client.process.wait(20)
    loaded = said.read_text().split()
    assert "quillet" in loaded
    assert {"lsprotocol", "pygls", "cattrs", "attrs", "asyncio", "logging", "urllib", "click"} & set(loaded) == set()


def test_the_command_says_what_it_needs(tmp_path: Path) -> None:
    program = "import sys; sys.modules['pygls'] = None\nfrom quillet.cli.serve import run\nsys.exit(run(None))"
    done = subprocess.run([sys.executable, "-c", program], capture_output=True, text=True, timeout=60, check=False)
    assert (done.returncode, done.stdout) == (2, "")
    assert 'pip install "quillet[serve]"' in done.stderr
