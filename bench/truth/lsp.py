"""A client of language servers, as small as the measurements need it: one server, one folder, questions one by one.

A server runs in a process group of its own; its processor time and memory are those of all its processes.
"""

from __future__ import annotations

import contextlib
import json
import os
import queue
import signal
import subprocess
import threading
from collections.abc import Sequence
from pathlib import Path
from typing import IO, Any
from urllib.parse import unquote, urlsplit

from bench.truth.places import Call, Change, Found, Place, Texts


class ServerError(Exception):
    """A server that answers with an error, ends, or takes too long."""


class Refused(ServerError):
    """An answer that is an error."""


class LanguageServer:
    """A running server. Questions are in the runners' lines and columns; answers as well."""

    def __init__(
        self,
        name: str,
        command: Sequence[str],
        folder: Path,
        *,
        timeout: float = 300,
        one_core: bool = False,
        settings: dict[str, Any] | None = None,
    ) -> None:
        self.name = name
        self._timeout = timeout
        self._settings = settings or {}
        self._texts = Texts()
        self._next = 0
        self.refused = 0
        self._answers: dict[int, queue.Queue[dict[str, Any]]] = {}
        self._versions: dict[str, int] = {}
        core = min(os.sched_getaffinity(0)) if one_core else None
        self._process = subprocess.Popen(
            [*([] if core is None else ["taskset", "-c", str(core)]), *command],
            stdin=subprocess.PIPE,
            stdout=subprocess.PIPE,
            stderr=subprocess.DEVNULL,
            cwd=folder,
            start_new_session=True,
        )
        self.folder = folder
        self.usage = Usage(self._process.pid)
        self._write = threading.Lock()
        threading.Thread(target=self._Read, args=(self._process.stdout,), daemon=True).start()
        uri = folder.as_uri()
        self.Ask(
            "initialize",
            {
                "processId": os.getpid(),
                "rootUri": uri,
                "rootPath": str(folder),
                "workspaceFolders": [{"uri": uri, "name": folder.name}],
                "capabilities": {
                    "general": {"positionEncodings": ["utf-16"]},
                    "workspace": {"configuration": True, "workspaceFolders": True},
                    "textDocument": {"definition": {"linkSupport": False}, "rename": {"prepareSupport": False}},
                },
            },
        )
        self._Tell("initialized", {})

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
        self._Tell("textDocument/didOpen", {"textDocument": document})

    def Type(self, path: str, place: Place, text: str) -> None:
        """Puts text into a line of an open buffer."""
        lines = self._texts.Lines(path)
        line = lines[place.line - 1]
        at = {"line": place.line - 1, "character": Utf16(line, place.column)}
        lines[place.line - 1] = line[: place.column] + text + line[place.column :]
        self._versions[path] += 1
        document = {"uri": Path(path).as_uri(), "version": self._versions[path]}
        change = {"range": {"start": at, "end": at}, "text": text}
        self._Tell("textDocument/didChange", {"textDocument": document, "contentChanges": [change]})

    def Close(self, path: str) -> None:
        self._texts.Close(path)
        self._Tell("textDocument/didClose", {"textDocument": {"uri": Path(path).as_uri()}})

    def Stop(self) -> None:
        """Ends the server and all that it started."""
        self.usage.Look()
        with contextlib.suppress(ServerError, OSError):
            self._timeout = 5
            self.Ask("shutdown", None)
            self._Tell("exit", None)
        with contextlib.suppress(ProcessLookupError):
            os.killpg(self._process.pid, signal.SIGKILL)
        self._process.wait()

    def __enter__(self) -> LanguageServer:
        return self

    def __exit__(self, *error: object) -> None:
        self.Stop()

    # --- the protocol

    def Ask(self, method: str, given: Any) -> Any:
        self._next += 1
        number = self._next
        self._answers[number] = queue.Queue()
        self._Send({"jsonrpc": "2.0", "id": number, "method": method, "params": given})
        try:
            answer = self._answers[number].get(timeout=self._timeout)
        except queue.Empty:
            raise ServerError(f"{self.name} did not answer {method} in {self._timeout:g} s") from None
        finally:
            del self._answers[number]
        if "ended" in answer:
            raise ServerError(f"{self.name} has ended")
        if "error" in answer:
            raise Refused(f"{self.name}: {method}: {answer['error'].get('message')}")
        return answer.get("result")

    def _Tell(self, method: str, given: Any) -> None:
        self._Send({"jsonrpc": "2.0", "method": method, "params": given})

    def _Send(self, message: dict[str, Any]) -> None:
        body = json.dumps(message).encode()
        stdin = self._process.stdin
        assert stdin is not None
        with self._write:
            try:
                stdin.write(b"Content-Length: %d\r\n\r\n%s" % (len(body), body))
                stdin.flush()
            except OSError as error:
                raise ServerError(f"{self.name} has ended") from error

    def _Read(self, stream: IO[bytes]) -> None:
        while True:
            length = 0
            while (line := stream.readline()) not in (b"\r\n", b"\n", b""):
                if line.lower().startswith(b"content-length:"):
                    length = int(line.split(b":")[1])
            if not line:
                break
            message = json.loads(stream.read(length))
            if "method" not in message:
                waiting = self._answers.get(message["id"])
                if waiting is not None:
                    waiting.put(message)
            elif "id" in message:
                self._Reply(message)
        for waiting in list(self._answers.values()):
            waiting.put({"ended": True})

    def _Reply(self, message: dict[str, Any]) -> None:
        """Servers ask for settings and register what they watch; they get those of a section, and a yes."""
        result: Any = None
        if message["method"] == "workspace/configuration":
            result = [self._settings.get(item.get("section"), {}) for item in message["params"]["items"]]
        elif message["method"] == "workspace/workspaceFolders":
            result = [{"uri": self.folder.as_uri(), "name": self.folder.name}]
        with contextlib.suppress(ServerError):
            self._Send({"jsonrpc": "2.0", "id": message["id"], "result": result})

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


class Usage:
    """The processor time and the memory of a process group."""

    def __init__(self, group: int) -> None:
        self._group = group
        self._seconds: dict[int, float] = {}
        self._tick = os.sysconf("SC_CLK_TCK")
        self.peak_kib = 0

    def Look(self) -> Usage:
        """Takes the time and the memory of now. A process that has ended keeps the time that was last seen."""
        memory = 0
        for pid in self._Members():
            with contextlib.suppress(OSError, ValueError, IndexError):
                fields = Path(f"/proc/{pid}/stat").read_text().rpartition(")")[2].split()
                self._seconds[pid] = (int(fields[11]) + int(fields[12])) / self._tick
                status = Path(f"/proc/{pid}/status").read_text()
                memory += int(status.split("VmHWM:")[1].split()[0])
        self.peak_kib = max(self.peak_kib, memory)
        return self

    @property
    def seconds(self) -> float:
        return sum(self._seconds.values())

    def _Members(self) -> list[int]:
        found = []
        for entry in Path("/proc").iterdir():
            if entry.name.isdigit():
                with contextlib.suppress(OSError):
                    fields = (entry / "stat").read_text().rpartition(")")[2].split()
                    if int(fields[2]) == self._group:
                        found.append(int(entry.name))
        return found


def Utf16(line: str, column: int) -> int:
    return column if line.isascii() else len(line[:column].encode("utf-16-le")) // 2


def FromUtf16(line: str, column: int) -> int:
    return column if line.isascii() else len(line.encode("utf-16-le")[: 2 * column].decode("utf-16-le", "replace"))


def PathOf(uri: str) -> str:
    return unquote(urlsplit(uri).path)
