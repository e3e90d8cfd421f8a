"""The same questions to other servers: how long each takes to its first answer and to its next ones, what that costs,
and how much memory.

Each first answer is that of a process of its own, counted from its start: so cold is what one waits for behind opening
an editor. Warm ones are the medians of further answers of the same process. A keystroke counts until its problems are
there. Processor time is that of all processes of a server; one that does not answer in time has none.
"""

from __future__ import annotations

import argparse
import os
import shutil
import statistics
import sys
import time
from collections.abc import Callable
from typing import Any, NamedTuple

from bench.connection import Connection, ServerError

_CAPABILITIES: dict[str, Any] = {
    "general": {"positionEncodings": ["utf-16"]},
    "workspace": {"configuration": True, "workspaceFolders": True, "symbol": {"dynamicRegistration": False}},
    "textDocument": {
        "documentSymbol": {"hierarchicalDocumentSymbolSupport": True},
        "definition": {"linkSupport": False},
        "publishDiagnostics": {"versionSupport": True},
        "diagnostic": {"dynamicRegistration": False},
    },
}
COMMANDS: dict[str, list[str]] = {
    "quillet": [sys.executable, "-m", "quillet", "serve"],
    "jedi-language-server": ["jedi-language-server"],
    "python-lsp-server": ["pylsp"],
    "basedpyright": ["basedpyright-langserver", "--stdio"],
    "ty": ["ty", "server"],
    "pyrefly": ["pyrefly", "lsp"],
    "zuban": ["zuban", "server"],
}
_WARM = 10


class Cost(NamedTuple):
    """Of one answer, in seconds; the memory of the server behind it in MiB."""

    wall: float
    processor: float
    memory: float


class Asker:
    """One server, one file that is open in it, and the questions."""

    def __init__(self, name: str, given: argparse.Namespace) -> None:
        self._given = given
        command = list(COMMANDS[name])
        found = shutil.which(command[0], path=f"{given.bin}:{os.environ['PATH']}") if given.bin else None
        command[0] = found or command[0]
        self._begun = time.perf_counter()
        self.server = Connection(
            name, command, given.folder.resolve(), capabilities=_CAPABILITIES, timeout=given.timeout
        )
        path = given.folder.resolve() / given.file
        self.uri = path.as_uri()
        self._version = 1
        text = path.read_bytes().decode("utf-8", "replace")
        self._last_line = text.count("\n")
        document = {"uri": self.uri, "languageId": "python", "version": 1, "text": text}
        self.server.Tell("textDocument/didOpen", {"textDocument": document})

    def since_start(self) -> float:
        return time.perf_counter() - self._begun

    def _at(self, **more: Any) -> dict[str, Any]:
        place = {"line": self._given.line - 1, "character": self._given.column - 1}
        return {"textDocument": {"uri": self.uri}, "position": place, **more}

    def symbols(self) -> Any:
        return self.server.Ask("textDocument/documentSymbol", {"textDocument": {"uri": self.uri}})

    def definition(self) -> Any:
        return self.server.Ask("textDocument/definition", self._at())

    def completion(self) -> Any:
        return self.server.Ask("textDocument/completion", self._at(context={"triggerKind": 1}))

    def references(self) -> Any:
        return self.server.Ask("textDocument/references", self._at(context={"includeDeclaration": True}))

    def program(self) -> Any:
        return self.server.Ask("workspace/symbol", {"query": self._given.query})

    def keystroke(self) -> Any:
        """A letter at the end of the text, until the problems of that text are there."""
        self._version += 1
        at = {"line": self._last_line, "character": 0}
        document = {"uri": self.uri, "version": self._version}
        change = {"range": {"start": at, "end": at}, "text": "x"}
        begin = len(self.server.told)
        self.server.Tell("textDocument/didChange", {"textDocument": document, "contentChanges": [change]})
        if self.server.capabilities.get("diagnosticProvider"):
            return self.server.Ask("textDocument/diagnostic", {"textDocument": {"uri": self.uri}})
        wanted = "textDocument/publishDiagnostics"
        return self.server.Wait(
            lambda told: (
                told.get("method") == wanted
                and told["params"]["uri"] == self.uri
                and told["params"].get("version") in (None, self._version)
            ),
            begin,
        )


QUESTIONS: dict[str, Callable[[Asker], Any]] = {
    "document symbols": Asker.symbols,
    "definition": Asker.definition,
    "completion": Asker.completion,
    "references": Asker.references,
    "program's symbols": Asker.program,
    "keystroke": Asker.keystroke,
}


def measure(name: str, question: str, given: argparse.Namespace) -> tuple[Cost, Cost, int] | str:
    """The first answer and the next ones, and how many things the first one has; or why there is none."""
    try:
        asker = Asker(name, given)
    except (OSError, ServerError) as error:
        return str(error)
    ask = QUESTIONS[question]
    with asker.server as server:
        try:
            answer = ask(asker)
            usage = server.usage.Look()
            cold = Cost(asker.since_start(), usage.seconds, usage.peak_kib / 1024)
            walls = []
            for _ in range(_WARM):
                begun = time.perf_counter()
                ask(asker)
                walls.append(time.perf_counter() - begun)
            seconds = usage.seconds
            usage = server.usage.Look()
            warm = Cost(statistics.median(walls), (usage.seconds - seconds) / _WARM, usage.peak_kib / 1024)
        except ServerError as error:
            return str(error)
    items = answer.get("items", answer) if isinstance(answer, dict) else answer
    return cold, warm, len(items or ())


def compare(given: argparse.Namespace) -> int:
    """Prints a table for each question."""
    for question in QUESTIONS:
        print(f"\n{question} | found | cold wall ms | cold processor ms | warm wall ms | warm processor ms | MiB")
        print("---|---|---|---|---|---|---")
        for name in given.only or COMMANDS:
            found = measure(name, question, given)
            if isinstance(found, str):
                print(f"{name} | {found}", flush=True)
                continue
            cold, warm, count = found
            figures = (cold.wall, cold.processor, warm.wall, warm.processor)
            shown = " | ".join(f"{figure * 1e3:.{0 if figure > 0.02 else 1}f}" for figure in figures)
            print(f"{name} | {count} | {shown} | {warm.memory:.0f}", flush=True)
    return 0
