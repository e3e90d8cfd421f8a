"""The same questions to other servers: how long each takes to its first answer and to its next ones, what that costs,
and how much memory.

Each first answer is that of a process of its own, counted from its start: so cold is what one waits for behind opening
an editor. Warm is the mean of further answers of the same process, once it has come to rest. A keystroke makes or mends
an error of syntax at the end of the text, and counts until the problems that are there say so, or no longer. Processor
time is that of all processes of a server. What does not answer in time, or with an error, has no figures.
"""

from __future__ import annotations

import argparse
import json
import shutil
import sys
import time
from collections.abc import Callable
from pathlib import Path
from typing import Any, NamedTuple

from bench.connection import Connection, ServerError

_CAPABILITIES: dict[str, Any] = {
    "general": {"positionEncodings": ["utf-16"]},
    "workspace": {"configuration": True, "workspaceFolders": True, "symbol": {"dynamicRegistration": False}},
    "textDocument": {
        "synchronization": {"didSave": True},
        "documentSymbol": {"hierarchicalDocumentSymbolSupport": True},
        "definition": {"linkSupport": False},
        "publishDiagnostics": {"versionSupport": True},
        "diagnostic": {"dynamicRegistration": False},
    },
}
COMMANDS: dict[str, list[str]] = {
    "quillet": [str(Path(sys.executable).with_name("quillet")), "serve"],
    "jedi-language-server": ["jedi-language-server"],
    "python-lsp-server": ["pylsp"],
    "basedpyright": ["basedpyright-langserver", "--stdio"],
    "ty": ["ty", "server"],
    "pyrefly": ["pyrefly", "lsp"],
    "zuban": ["zuban", "server"],
}
_WARM = 10
# A server is at rest when it takes less than this share of a processor for a while.
_REST, _LOOK, _MOST_RESTLESS = 0.02, 0.5, 60
_PUBLISHED = "textDocument/publishDiagnostics"


class Asked(NamedTuple):
    """Where is asked: at a name that stands behind a dot, and for symbols of the program like a word."""

    folder: Path
    file: str
    line: int
    column: int
    query: str


class Cost(NamedTuple):
    """Of one answer, in seconds; the memory of the server behind it in MiB."""

    wall: float
    processor: float
    memory: float


class Measured(NamedTuple):
    """The first answer and the next ones, and how many things the first one has."""

    cold: Cost
    warm: Cost
    count: int


class Asker:
    """One server, one file that is open in it, and the questions."""

    def __init__(self, command: list[str], asked: Asked, timeout: float) -> None:
        self._asked = asked
        self._begun = time.perf_counter()
        self.server = Connection(command[0], command, asked.folder, capabilities=_CAPABILITIES, timeout=timeout)
        path = asked.folder / asked.file
        self.uri = path.as_uri()
        self._version = 1
        text = path.read_bytes().decode("utf-8", "replace")
        lines = text.split("\n")
        self._end = {"line": len(lines) - 1, "character": len(lines[-1].encode("utf-16-le")) // 2}
        self._is_broken = False
        document = {"uri": self.uri, "languageId": "python", "version": 1, "text": text}
        self.server.Tell("textDocument/didOpen", {"textDocument": document})

    def since_start(self) -> float:
        return time.perf_counter() - self._begun

    def rest(self) -> None:
        """Waits until the server does nothing, a minute at most."""
        usage = self.server.usage
        deadline = time.monotonic() + _MOST_RESTLESS
        usage.LookAtTime()
        while time.monotonic() < deadline:
            seconds = usage.seconds
            time.sleep(_LOOK)
            usage.LookAtTime()
            if usage.seconds - seconds < _REST * _LOOK:
                return

    def _at(self, **more: Any) -> dict[str, Any]:
        place = {"line": self._asked.line - 1, "character": self._asked.column - 1}
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
        return self.server.Ask("workspace/symbol", {"query": self._asked.query})

    def keystroke(self) -> Any:
        """A bracket comes at the end of the text, or goes, until the problems of that text are there."""
        self._version += 1
        end = dict(self._end)
        after = {"line": end["line"], "character": end["character"] + 1}
        span = {"start": end, "end": after if self._is_broken else end}
        change = {"range": span, "text": "" if self._is_broken else "("}
        self._is_broken = not self._is_broken
        begin = len(self.server.told)
        document = {"uri": self.uri, "version": self._version}
        self.server.Tell("textDocument/didChange", {"textDocument": document, "contentChanges": [change]})
        if self.server.capabilities.get("diagnosticProvider"):
            answer = self.server.Ask("textDocument/diagnostic", {"textDocument": {"uri": self.uri}})
            if not self._is_right(answer["items"]):
                raise ServerError("the problems are not those of the text")
            return answer
        told = self.server.Wait(self._is_told, begin)
        return told["params"]["diagnostics"]

    def _is_told(self, message: dict[str, Any]) -> bool:
        """Whether a message has the problems of the text of now: by its version, and by what it says."""
        if message.get("method") != _PUBLISHED or message["params"]["uri"] != self.uri:
            return False
        told = message["params"]
        return told.get("version") in (None, self._version) and self._is_right(told["diagnostics"])

    def _is_right(self, problems: list[dict[str, Any]]) -> bool:
        """Whether there is an error at the end of the text exactly if one was made."""
        return self._is_broken == any(
            at.get("severity", 1) == 1 and at["range"]["end"]["line"] >= self._end["line"] for at in problems
        )


QUESTIONS: dict[str, Callable[[Asker], Any]] = {
    "document symbols": Asker.symbols,
    "definition": Asker.definition,
    "completion": Asker.completion,
    "references": Asker.references,
    "workspace symbols": Asker.program,
    "keystroke to diagnostics": Asker.keystroke,
}


def command_of(name: str, folder: Path | None) -> list[str]:
    """How a server is started, which may be installed in a folder."""
    command = list(COMMANDS[name])
    found = shutil.which(command[0], path=str(folder)) if folder is not None else None
    return [found or command[0], *command[1:]]


def measure(command: list[str], question: str, asked: Asked, timeout: float) -> Measured | str:
    """What a question costs a server, or why there is no answer."""
    ask = QUESTIONS[question]
    try:
        asker = Asker(command, asked, timeout)
        with asker.server as server:
            answer = ask(asker)
            wall = asker.since_start()
            usage = server.usage.Look()
            cold = Cost(wall, usage.seconds, usage.peak_kib / 1024)
            asker.rest()
            seconds = usage.seconds
            begun = time.perf_counter()
            for _ in range(_WARM):
                ask(asker)
            wall = time.perf_counter() - begun
            usage = server.usage.Look()
            warm = Cost(wall / _WARM, (usage.seconds - seconds) / _WARM, usage.peak_kib / 1024)
    except (OSError, ServerError, KeyError, TypeError) as error:
        return f"{type(error).__name__}: {error}"
    items = answer.get("items", answer) if isinstance(answer, dict) else answer
    return Measured(cold, warm, len(items or ()))


def compare(given: argparse.Namespace) -> int:
    """Prints a table: a row for each question in each project, a column for each server."""
    begun = time.perf_counter()
    names = given.only or list(COMMANDS)
    rows = []
    for folder, file, line, column, query in given.projects:
        asked = Asked(Path(folder).resolve(), file, int(line), int(column), query)
        for question in given.questions or QUESTIONS:
            cells = []
            for name in names:
                found = measure(command_of(name, given.bin), question, asked, given.timeout)
                shown = found if isinstance(found, str) else _shown(found)
                print(f"{asked.folder.name}, {question}, {name}: {shown}", file=sys.stderr, flush=True)
                if given.save is not None:
                    _save(given.save, asked.folder.name, question, name, found)
                cells.append("no answer" if isinstance(found, str) else shown)
            rows.append((f"{asked.folder.name}: {question}", cells))
    print("Milliseconds of the processor (of the clock): first answer from the start, then each further one; MiB.\n")
    print(f"| | {' | '.join(names)} |")
    print(f"|---|{'---|' * len(names)}")
    for row, cells in rows:
        print(f"| {row} | {' | '.join(cells)} |")
    print(f"\n{time.perf_counter() - begun:.0f} s for all of it")
    return 0


def _shown(found: Measured) -> str:
    cold, warm = found.cold, found.warm
    return (
        f"{_milliseconds(cold.processor)} ({_milliseconds(cold.wall)}),"
        f" {_milliseconds(warm.processor)} ({_milliseconds(warm.wall)}); {warm.memory:.0f}; {found.count} found"
    )


def _milliseconds(seconds: float) -> str:
    figure = seconds * 1e3
    return f"{figure:,.0f}" if figure >= 10 else f"{figure:.1f}" if figure >= 1 else f"{figure:.2f}"


def _save(path: Path, project: str, question: str, name: str, found: Measured | str) -> None:
    line: dict[str, Any] = {"project": project, "question": question, "server": name}
    if isinstance(found, str):
        line["error"] = found
    else:
        line |= {"cold": found.cold._asdict(), "warm": found.warm._asdict(), "count": found.count}
    with path.open("a", encoding="utf-8") as file:
        file.write(json.dumps(line) + "\n")
