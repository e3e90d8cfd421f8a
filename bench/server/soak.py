"""Random edits and questions in real files: no error, no answer for another text, the same text at the end, and memory
that does not grow.

The client holds the texts as well. Now and then they are opened in a server that has seen nothing of the edits, and
what both say of one is compared.
"""

from __future__ import annotations

import random
import re
import sys
import time
from pathlib import Path
from typing import Any

from bench.connection import CAPABILITIES, Connection, Refused

_CAPABILITIES = {
    **CAPABILITIES,
    "textDocument": {"documentSymbol": {"hierarchicalDocumentSymbolSupport": True}, "rename": {"prepareSupport": True}},
}
_PIECES = (
    "x", ".", "(", ")", "\n", "    ", "self.", "def f(a):\n    return a\n", "import os\n", "'", "# ä😀\n", "[", "]",
    ":", "class C:\n    pass\n", "if x:\n", "\r\n", ", ", " = ", "lambda: ", '"""', "\t",
)  # fmt: skip
_AT_A_PLACE = (
    "definition", "declaration", "typeDefinition", "completion", "hover", "signatureHelp", "documentHighlight",
    "prepareRename", "prepareCallHierarchy", "prepareTypeHierarchy",
)  # fmt: skip
_OF_A_FILE = ("documentSymbol", "foldingRange", "semanticTokens/full")


class Text:
    """A text that is edited at random, here and in the server alike."""

    def __init__(self, path: Path) -> None:
        self.uri = path.as_uri()
        self.text = self.original = path.read_bytes().decode("utf-8", "replace")
        self.version = 1

    def offset(self, chance: random.Random) -> int:
        """A place in the text; between the two of a line end there is none."""
        at = chance.randrange(len(self.text) + 1)
        return at - (self.text[at - 1 : at + 1] == "\r\n")

    def position(self, offset: int) -> dict[str, int]:
        rows = re.split(r"\r\n|\r|\n", self.text[:offset])
        return {"line": len(rows) - 1, "character": len(rows[-1].encode("utf-16-le")) // 2}

    def change(self, chance: random.Random) -> dict[str, Any]:
        """An edit; the whole text as it was where it has grown too much."""
        self.version += 1
        if len(self.text) > 1.2 * len(self.original) + 2000:
            self.text = self.original
            return {"text": self.text}
        begin = self.offset(chance)
        end = min(begin + chance.choice((0, 0, 0, 1, 4, 20)), len(self.text))
        end += self.text[end - 1 : end + 1] == "\r\n"
        new = chance.choice(_PIECES)
        span = {"start": self.position(begin), "end": self.position(end)}
        self.text = self.text[:begin] + new + self.text[end:]
        return {"range": span, "text": new}


def _memory(server: Connection) -> int:
    """MiB that the server holds now."""
    status = Path(f"/proc/{server.process.pid}/status").read_text()
    return int(status.split("VmRSS:")[1].split()[0]) // 1024


def run(folder: Path, steps: int, seed: int) -> int:
    """Prints what happened; 1 where something was wrong."""
    chance = random.Random(seed)
    paths = sorted(path for path in folder.rglob("*.py") if 2_000 < path.stat().st_size < 60_000)
    texts = [Text(path) for path in chance.sample(paths, 12)]
    command = [sys.executable, "-m", "quillet", "serve"]
    counts: dict[str, int] = {}
    errors: list[str] = []
    memory: list[int] = []
    compared = 0
    begun = time.perf_counter()
    with (
        Connection("soak", command, folder, capabilities=_CAPABILITIES) as server,
        Connection("fresh", command, folder, capabilities=_CAPABILITIES) as fresh,
    ):
        for text in texts:
            _open(server, text.uri, text.text)
        for step in range(steps):
            text = chance.choice(texts)
            kind = "change" if chance.random() < 0.5 else chance.choice((*_AT_A_PLACE, *_OF_A_FILE, "inlayHint"))
            counts[kind] = counts.get(kind, 0) + 1
            try:
                if kind == "change":
                    _change(server, text, text.change(chance))
                else:
                    _ask(server, text, kind, chance)
            except Refused as refused:
                if refused.code != -32803:  # a rename that cannot be
                    errors.append(f"{step}: {kind}: {refused}")
            if step % 100 == 99:
                compared += 1
                problem = _compare(server, fresh, texts, text, step)
                if problem:
                    errors.append(problem)
            if step % 1000 == 999:
                memory.append(_memory(server))
                print(f"{step + 1} steps, {memory[-1]} MiB, {len(errors)} errors", flush=True)
        for text in texts:
            problem = _compare(server, fresh, texts, text, steps)
            if problem:
                errors.append(problem)
    seconds = time.perf_counter() - begun
    for error in errors[:20]:
        print(error)
    grown = memory[-1] - memory[0] if memory else 0
    print(
        f"{steps} steps in {seconds:.0f} s, {counts.get('change', 0)} edits, {compared + len(texts)} comparisons,"
        f" {len(errors)} errors; memory {memory[0] if memory else 0} MiB after the first thousand,"
        f" {memory[-1] if memory else 0} MiB at the end ({grown:+d})"
    )
    return 1 if errors else 0


def _open(server: Connection, uri: str, text: str) -> None:
    document = {"uri": uri, "languageId": "python", "version": 1, "text": text}
    server.Tell("textDocument/didOpen", {"textDocument": document})


def _change(server: Connection, text: Text, change: dict[str, Any]) -> None:
    document = {"uri": text.uri, "version": text.version}
    server.Tell("textDocument/didChange", {"textDocument": document, "contentChanges": [change]})


def _ask(server: Connection, text: Text, kind: str, chance: random.Random) -> Any:
    asked: dict[str, Any] = {"textDocument": {"uri": text.uri}}
    if kind in _AT_A_PLACE:
        asked["position"] = text.position(text.offset(chance))
    elif kind == "inlayHint":
        line = text.position(text.offset(chance))["line"]
        asked["range"] = {"start": {"line": line, "character": 0}, "end": {"line": line + 20, "character": 0}}
    return server.Ask(f"textDocument/{kind}", asked)


def _compare(server: Connection, fresh: Connection, texts: list[Text], text: Text, step: int) -> str:
    """What the two servers do not say alike of a text; empty where they do."""
    for other in texts:  # imports lead to the other ones as they are
        _open(fresh, other.uri, other.text)
    asked = {"textDocument": {"uri": text.uri}}
    said = ""
    for kind in _OF_A_FILE:
        question = f"textDocument/{kind}"
        if server.Ask(question, asked) != fresh.Ask(question, asked):
            said = f"{step}: {kind} of {text.uri} is not that of the client's text"
    problems = [each.Ask("textDocument/diagnostic", asked)["items"] for each in (server, fresh)]
    if problems[0] != problems[1]:
        said = f"{step}: the problems of {text.uri} are not those of the client's text"
    for other in texts:
        fresh.Tell("textDocument/didClose", {"textDocument": {"uri": other.uri}})
    fresh.told.clear()
    server.told.clear()
    return said
