"""A client for the tests of the language server: a project of a few files, and questions at marked places."""

from __future__ import annotations

import os
import sys
from pathlib import Path
from typing import Any

from bench.connection import Connection

CAPABILITIES: dict[str, Any] = {
    "general": {"positionEncodings": ["utf-16"]},
    "window": {"workDoneProgress": True},
    "workspace": {
        "configuration": True,
        "workspaceFolders": True,
        "didChangeWatchedFiles": {"dynamicRegistration": True},
        "workspaceEdit": {"documentChanges": True},
    },
    "textDocument": {
        "documentSymbol": {"hierarchicalDocumentSymbolSupport": True},
        "rename": {"prepareSupport": True},
        "hover": {"contentFormat": ["markdown", "plaintext"]},
    },
}
COMMAND = [sys.executable, "-m", "quillet", "serve"]


class Client(Connection):
    """An editor, as the tests drive it. It holds the texts of its buffers itself."""

    def __init__(self, folder: Path, *, encoding: str = "utf-16", **options: Any) -> None:
        capabilities = {**CAPABILITIES, **options.pop("capabilities", {})}
        capabilities["general"] = {"positionEncodings": [encoding]}
        environment = {**os.environ, "VIRTUAL_ENV": ""}
        options.setdefault("timeout", 120)
        self.texts: dict[str, str] = {}
        self.versions: dict[str, int] = {}
        super().__init__(
            "quillet",
            options.pop("command", COMMAND),
            folder,
            capabilities=capabilities,
            environment=environment,
            **options,
        )

    def uri(self, name: str) -> str:
        return (self.folder / name).as_uri()

    def open(self, name: str, text: str | None = None) -> None:
        if text is None:
            text = (self.folder / name).read_bytes().decode()
        self.texts[name] = text
        self.versions[name] = 1
        document = {"uri": self.uri(name), "languageId": "python", "version": 1, "text": text}
        self.Tell("textDocument/didOpen", {"textDocument": document})

    def change(self, name: str, *changes: dict[str, Any]) -> None:
        self.versions[name] += 1
        document = {"uri": self.uri(name), "version": self.versions[name]}
        self.Tell("textDocument/didChange", {"textDocument": document, "contentChanges": list(changes)})

    def close(self, name: str) -> None:
        del self.texts[name]
        self.Tell("textDocument/didClose", {"textDocument": {"uri": self.uri(name)}})

    def at(self, name: str, needle: str, more: int = 0) -> dict[str, Any]:
        """Parameters for the first place of a text in a file that is ASCII in front of it on its line."""
        text = self.texts.get(name) or (self.folder / name).read_text(encoding="utf-8")
        offset = text.index(needle) + more
        line = text.count("\n", 0, offset)
        return {
            "textDocument": {"uri": self.uri(name)},
            "position": {"line": line, "character": offset - (text.rfind("\n", 0, offset) + 1)},
        }

    def ask(self, method: str, name: str, needle: str = "", more: int = 0, **given: Any) -> Any:
        asked = self.at(name, needle, more) if needle else {"textDocument": {"uri": self.uri(name)}}
        return self.Ask(f"textDocument/{method}", {**asked, **given})

    def shown(self, locations: Any) -> list[str]:
        """Locations as `file:line:character-end`, from 0."""
        return [
            f"{Path(at['uri']).name}:{at['range']['start']['line']}:"
            f"{at['range']['start']['character']}-{at['range']['end']['character']}"
            for at in locations or ()
        ]

    def diagnostics(self, name: str, version: int | None = None) -> list[Any]:
        """What the server tells of a file at a version, the one of now without any."""
        wanted = self.versions[name] if version is None else version
        message = self.Wait(
            lambda told: (
                told.get("method") == "textDocument/publishDiagnostics"
                and told["params"]["uri"] == self.uri(name)
                and told["params"].get("version") == wanted
            )
        )
        found: list[Any] = message["params"]["diagnostics"]
        return found


def edit(line: int, begin: int, end_line: int, end: int, text: str) -> dict[str, Any]:
    span = {"start": {"line": line, "character": begin}, "end": {"line": end_line, "character": end}}
    return {"range": span, "text": text}
