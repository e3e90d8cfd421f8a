"""A client of language servers, as small as the measurements need it: one server, one folder, questions one by one."""

from __future__ import annotations

from collections.abc import Sequence
from pathlib import Path
from typing import Any
from urllib.parse import unquote, urlsplit

from bench.connection import Connection, Refused, ServerError, Usage
from bench.truth.places import Call, Change, Found, Place, Texts

__all__ = ["LanguageServer", "PathOf", "Refused", "ServerError", "Usage"]


class LanguageServer(Connection):
    """A running server. Questions are in the runners' lines and columns; answers as well."""

    def __init__(self, name: str, command: Sequence[str], folder: Path, **options: Any) -> None:
        self._texts = Texts()
        self._versions: dict[str, int] = {}
        self.refused = 0
        super().__init__(name, command, folder, **options)

    # --- questions

    def Definitions(self, place: Place) -> list[Found]:
        return self._Locations("textDocument/definition", self._Position(place))

    def References(self, place: Place) -> list[Found]:
        asked = {**self._Position(place), "context": {"includeDeclaration": True}}
        return self._Locations("textDocument/references", asked)

    def Rename(self, place: Place, new_name: str) -> list[Change] | None:
        """None where it is refused."""
        try:
            answer = self.Ask("textDocument/rename", {**self._Position(place), "newName": new_name})
        except Refused:
            return None
        files = dict((answer or {}).get("changes") or {})
        for each in (answer or {}).get("documentChanges") or ():
            if "edits" in each:
                files.setdefault(each["textDocument"]["uri"], []).extend(each["edits"])
        return [
            Change(found.path, found.line, found.column, found.end, edit["newText"])
            for uri, edits in files.items()
            for edit in edits
            for found in [self._Found(uri, edit["range"])]
        ]

    def Callers(self, place: Place) -> list[Call]:
        return self._Calls("incomingCalls", "from", place)

    def Callees(self, place: Place) -> list[Call]:
        return self._Calls("outgoingCalls", "to", place)

    def _Calls(self, question: str, end: str, place: Place) -> list[Call]:
        found = []
        try:
            for item in self.Ask("textDocument/prepareCallHierarchy", self._Position(place)) or ():
                for call in self.Ask(f"callHierarchy/{question}", {"item": item}) or ():
                    function = self._Found(call[end]["uri"], call[end]["selectionRange"])
                    path = PathOf(call["from"]["uri"]) if end == "from" else place.path
                    sites = [self._Found(Path(path).as_uri(), span).place for span in call["fromRanges"]]
                    found.append(Call(function, sites))
        except Refused:
            self.refused += 1
        return found

    def Complete(self, place: Place) -> list[str]:
        answer = self.Ask("textDocument/completion", self._Position(place)) or []
        items = answer["items"] if isinstance(answer, dict) else answer
        return [item["label"] for item in items]

    def Problems(self, path: str) -> Any:
        """The problems of a file, asked for. A server that only pushes them raises."""
        return self.Ask("textDocument/diagnostic", {"textDocument": {"uri": Path(path).as_uri()}})

    def Outline(self, path: str) -> Any:
        return self.Ask("textDocument/documentSymbol", {"textDocument": {"uri": Path(path).as_uri()}})

    # --- buffers

    def Open(self, path: str, text: str | None = None) -> None:
        if text is not None:
            self._texts.Open(path, text)
        shown = "\n".join(self._texts.Lines(path))
        document = {"uri": Path(path).as_uri(), "languageId": "python", "version": 1, "text": shown}
        self._versions[path] = 1
        self.Tell("textDocument/didOpen", {"textDocument": document})

    def Type(self, path: str, place: Place, text: str) -> None:
        """Puts text into a line of an open buffer."""
        lines = self._texts.Lines(path)
        line = lines[place.line - 1]
        at = {"line": place.line - 1, "character": Utf16(line, place.column)}
        lines[place.line - 1] = line[: place.column] + text + line[place.column :]
        self._versions[path] += 1
        document = {"uri": Path(path).as_uri(), "version": self._versions[path]}
        change = {"range": {"start": at, "end": at}, "text": text}
        self.Tell("textDocument/didChange", {"textDocument": document, "contentChanges": [change]})

    def Close(self, path: str) -> None:
        self._texts.Close(path)
        self.Tell("textDocument/didClose", {"textDocument": {"uri": Path(path).as_uri()}})

    def _Position(self, place: Place) -> dict[str, Any]:
        line = self._texts.Line(place.path, place.line)
        position = {"line": place.line - 1, "character": Utf16(line, place.column)}
        return {"textDocument": {"uri": Path(place.path).as_uri()}, "position": position}

    def _Locations(self, method: str, asked: Any) -> list[Found]:
        """An answer of places; none where the server has only an error to say, which is counted."""
        try:
            answer = self.Ask(method, asked)
        except Refused:
            self.refused += 1
            return []
        found = []
        for each in answer if isinstance(answer, list) else [answer] if answer else []:
            uri = each.get("targetUri") or each["uri"]
            found.append(self._Found(uri, each.get("targetSelectionRange") or each["range"]))
        return found

    def _Found(self, uri: str, span: dict[str, Any]) -> Found:
        path = PathOf(uri)
        line = span["start"]["line"] + 1
        text = self._texts.Line(path, line)
        begin, end = (FromUtf16(text, span[side]["character"]) for side in ("start", "end"))
        return Found(path, line, begin, end)


def Utf16(line: str, column: int) -> int:
    return column if line.isascii() else len(line[:column].encode("utf-16-le")) // 2


def FromUtf16(line: str, column: int) -> int:
    return column if line.isascii() else len(line.encode("utf-16-le")[: 2 * column].decode("utf-16-le", "replace"))


def PathOf(uri: str) -> str:
    return unquote(urlsplit(uri).path)
