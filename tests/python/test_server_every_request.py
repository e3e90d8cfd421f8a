"""Every request of the language server in each encoding of positions, and taken back."""

from __future__ import annotations

import contextlib
import json
from collections.abc import Callable, Iterator
from pathlib import Path
from typing import Any

import pytest

pytest.importorskip("pygls")

from bench.connection import Refused
from serving import Client

# What stands in front of each name counts differently in each encoding.
SHOP = """\
class Shop:
    '''Sells 😀.'''
    title = '😀ä'; name: str = '𝒳'

    def total(self, größe='😀', tax=0.0): '''What it costs: 😀.'''; return self.title + größe


class Fair(Shop):
    def total(self, größe='😀', tax=0.0): '😀'; return super().total(größe, tax)


def pay(shop: Shop):
    x = '😀𝒳ä'; amount = shop.total('😀ä', 1.0); print('😀', amount, missing); return amount


x = '😀'; fair = Fair(); pay(fair)
'😀'; import nowhere
class Last(Fair): '😀'
"""
UNITS: dict[str, Callable[[str], int]] = {
    "utf-8": lambda text: len(text.encode()),
    "utf-16": lambda text: len(text.encode("utf-16-le")) // 2,
    "utf-32": len,
}
LINES = SHOP.split("\n")
WHOLE = {"start": {"line": 0, "character": 0}, "end": {"line": len(LINES), "character": 0}}
# A request that is asked at a name, the name, and what is asked beside it.
AT_A_NAME: list[tuple[str, str, dict[str, Any]]] = [
    ("completion", "total('😀ä'", {}),
    ("hover", "total('😀ä'", {}),
    ("signatureHelp", "1.0); print", {}),
    ("definition", "total('😀ä'", {}),
    ("declaration", "pay(fair)", {}),
    ("typeDefinition", "fair)", {}),
    ("implementation", "total(self", {}),
    ("references", "total('😀ä'", {"context": {"includeDeclaration": True}}),
    ("documentHighlight", "amount, missing", {}),
    ("prepareRename", "amount, missing", {}),
    ("rename", "amount, missing", {"newName": "summe"}),
    ("prepareCallHierarchy", "pay(fair)", {}),
    ("prepareTypeHierarchy", "Fair()", {}),
]
OF_A_FILE: list[tuple[str, dict[str, Any]]] = [
    ("documentSymbol", {}),
    ("foldingRange", {}),
    ("semanticTokens/full", {}),
    ("semanticTokens/range", {"range": WHOLE}),
    ("inlayHint", {"range": WHOLE}),
    ("diagnostic", {}),
]
HIERARCHIES = {
    "prepareCallHierarchy": ("callHierarchy/incomingCalls", "callHierarchy/outgoingCalls"),
    "prepareTypeHierarchy": ("typeHierarchy/supertypes", "typeHierarchy/subtypes"),
}
REQUESTS = [*(f"textDocument/{name}" for name, *_ in (*AT_A_NAME, *OF_A_FILE)), "textDocument/selectionRange"]


def place(needle: str, units: Callable[[str], int]) -> dict[str, int]:
    [(line, text)] = [(number, text) for number, text in enumerate(LINES) if needle in text][:1]
    return {"line": line, "character": units(text[: text.index(needle)])}


def letters(line: int, character: int, units: Callable[[str], int]) -> int:
    """The letter at a column; a column in the middle of one is an error."""
    text = [*LINES, ""][line]
    [at] = [at for at in range(len(text) + 1) if units(text[:at]) == character]
    return at


def plain(answer: Any, units: Callable[[str], int]) -> Any:
    """An answer with letters for columns."""
    if isinstance(answer, list):
        return [plain(each, units) for each in answer]
    if not isinstance(answer, dict):
        return answer
    if answer.keys() == {"line", "character"}:
        return answer["line"], letters(answer["line"], answer["character"], units)
    if isinstance(answer.get("uri"), str) and not answer["uri"].endswith("shop.py"):
        return answer["uri"]  # of a library
    if isinstance(answer.get("data"), list):
        return tokens(answer["data"], units)
    return {key: plain(value, units) for key, value in answer.items() if key != "resultId"}


def tokens(data: list[int], units: Callable[[str], int]) -> list[tuple[int, str, int, int]]:
    """What semantic tokens are of."""
    found, line, column = [], 0, 0
    for at in range(0, len(data), 5):
        lines, columns, length, kind, modifiers = data[at : at + 5]
        line, column = line + lines, columns if lines else column + columns
        begin, end = letters(line, column, units), letters(line, column + length, units)
        found.append((line, LINES[line][begin:end], kind, modifiers))
    return found


def ask_everything(client: Client, units: Callable[[str], int]) -> dict[str, Any]:
    """All answers, by what was asked."""
    document = {"textDocument": {"uri": client.uri("shop.py")}}
    answers: dict[str, Any] = {}
    for name, needle, more in AT_A_NAME:
        answer = client.Ask(f"textDocument/{name}", {**document, "position": place(needle, units), **more})
        answers[name] = answer
        for method in HIERARCHIES.get(name, ()):
            answers[method] = client.Ask(method, {"item": answer[0]})
    item = next(each for each in answers["completion"]["items"] if each["label"] == "total")
    answers["completionItem/resolve"] = client.Ask("completionItem/resolve", item)
    for name, more in OF_A_FILE:
        answers[name] = client.Ask(f"textDocument/{name}", {**document, **more})
    positions = [place("größe, tax)", units), place("amount, missing", units)]
    answers["selectionRange"] = client.Ask("textDocument/selectionRange", {**document, "positions": positions})
    answers["workspace/symbol"] = client.Ask("workspace/symbol", {"query": "total"})
    return {name: plain(answer, units) for name, answer in answers.items()}


def test_every_request_in_every_encoding(tmp_path: Path) -> None:
    (tmp_path / "shop.py").write_text(SHOP, encoding="utf-8")
    answers = []
    for encoding, units in UNITS.items():
        with Client(tmp_path.resolve(), encoding=encoding) as client:
            assert client.capabilities["positionEncoding"] == encoding
            client.open("shop.py")
            answers.append(ask_everything(client, units))
    first = answers[0]
    assert len(first) == len(AT_A_NAME) + len(OF_A_FILE) + 7
    assert all(first.values()), [name for name, answer in first.items() if not answer]
    for other in answers[1:]:
        for name, answer in first.items():
            assert answer == other[name], name
    # And they are what they have to be.
    amount = LINES[12].index("amount, missing")
    highlights = [(at["range"]["start"], at["range"]["end"]) for at in first["documentHighlight"]]
    assert ((12, amount), (12, amount + 6)) in highlights
    assert [at["range"]["start"] for at in first["diagnostic"]["items"]] == [
        (12, LINES[12].index("missing")),
        (16, LINES[16].index("nowhere")),
    ]
    assert {"summe"} == {edit["newText"] for edit in first["rename"]["documentChanges"][0]["edits"]}


@contextlib.contextmanager
def at_once(client: Client) -> Iterator[None]:
    """What is sent goes in one piece, at the end."""
    held: list[bytes] = []

    def hold(message: Any) -> None:
        body = json.dumps(message).encode()
        held.append(b"Content-Length: %d\r\n\r\n%s" % (len(body), body))

    client.Send = hold  # type: ignore[method-assign]
    try:
        yield
    finally:
        del client.Send  # type: ignore[method-assign]
    client.Send(b"".join(held))


def test_every_request_is_taken_back(tmp_path: Path) -> None:
    body = "".join(f"def f_{n}(a):\n    return Base().run(a.run(f_{n}))\n\n\n" for n in range(60))
    (tmp_path / "base.py").write_text("class Base:\n    def run(self, x):\n        return x\n")
    (tmp_path / "shop.py").write_text(SHOP, encoding="utf-8")
    for number in range(400):
        (tmp_path / f"m_{number}.py").write_text(f"from base import Base\n\n\n{body}")
    with Client(tmp_path.resolve()) as client:
        client.open("base.py")
        client.open("shop.py")
        document = {"textDocument": {"uri": client.uri("shop.py")}}
        [call] = client.ask("prepareCallHierarchy", "base.py", "run")
        asked = {**client.at("base.py", "run"), "context": {"includeDeclaration": True}}
        at = {"position": {"line": 0, "character": 6}, "positions": [], "range": WHOLE, "newName": "x"}
        at["context"] = {"includeDeclaration": True}
        with at_once(client):
            busy = client.Begin("textDocument/references", asked)  # the others wait behind it
            questions = {method: client.Begin(method, {**document, **at}) for method in REQUESTS}
            for methods in HIERARCHIES.values():
                questions |= {method: client.Begin(method, {"item": call}) for method in methods}
            questions["workspace/symbol"] = client.Begin("workspace/symbol", {"query": "f"})
            questions["completionItem/resolve"] = client.Begin("completionItem/resolve", {"label": "x"})
            for number in questions.values():
                client.Tell("$/cancelRequest", {"id": number})
            client.Tell("$/cancelRequest", {"id": busy})
        for method, number in {**questions, "busy": busy}.items():
            with pytest.raises(Refused) as refused:
                client.Answer(number)
            assert refused.value.code == -32800, method
        assert len(client.ask("documentSymbol", "base.py")) == 1
