"""Every request of the language server, by a client over pipes."""

from __future__ import annotations

import itertools
import sys
from collections.abc import Iterator
from pathlib import Path
from typing import Any

import pytest

pytest.importorskip("pygls")

from bench.connection import Refused
from serving import Client, edit

FILES = {
    "pyproject.toml": "[tool.quillet]\nversion = '3.12'\n",
    "shop.py": '''\
"""Shops."""
from abc import ABC


class Shop(ABC):
    """Sells things."""

    def __init__(self, name: str) -> None:
        self.name = name

    def total(self, tax: float = 0) -> float:
        """What all of it costs."""
        return 1.0

    def broken(self
''',
    "market.py": """\
from shop import Shop


class Market(Shop):
    def total(self, tax: float = 0) -> float:
        return super().total(tax)


class Fair(Market):
    pass


def pay(shop: Shop):
    # What it takes.
    # All of it.
    amount = shop.total(2)
    return amount


fair = Fair("x")
pay(fair)
print(fair.total(), undefined_name)
import nowhere_to_be_found


def later(thing):
    return thing.total()
""",
}


@pytest.fixture(scope="module")
def folder(tmp_path_factory: pytest.TempPathFactory) -> Path:
    folder = tmp_path_factory.mktemp("shop").resolve()
    for name, text in FILES.items():
        (folder / name).write_text(text)
    return folder


@pytest.fixture(scope="module")
def client(folder: Path) -> Iterator[Client]:
    with Client(folder) as client:
        client.open("market.py")
        client.open("shop.py")
        yield client


def test_it_says_what_it_can(client: Client) -> None:
    can = client.capabilities
    assert can["positionEncoding"] == "utf-16"
    assert (can["textDocumentSync"]["openClose"], can["textDocumentSync"]["change"]) == (True, 2)
    for name in (
        "completion definition declaration typeDefinition implementation references documentHighlight documentSymbol"
        " workspaceSymbol rename callHierarchy typeHierarchy semanticTokens foldingRange selectionRange inlayHint"
        " diagnostic hover signatureHelp"
    ).split():
        assert can[f"{name}Provider"], name
    assert can["workspace"]["workspaceFolders"] == {"supported": True, "changeNotifications": True}


def test_places(client: Client) -> None:
    assert client.shown(client.ask("definition", "market.py", "Shop)")) == ["shop.py:4:6-10"]
    assert client.shown(client.ask("definition", "market.py", "total(2)")) == ["shop.py:10:8-13"]
    assert client.shown(client.ask("typeDefinition", "market.py", "fair)")) == ["market.py:8:6-10"]
    assert client.shown(client.ask("implementation", "shop.py", "Shop(")) == ["market.py:3:6-12", "market.py:8:6-10"]
    assert client.shown(client.ask("implementation", "shop.py", "total")) == ["market.py:4:8-13"]
    assert client.shown(client.ask("declaration", "market.py", "pay(fair)")) == ["market.py:12:4-7"]
    [declared] = client.ask("declaration", "market.py", "print")
    assert declared["uri"].endswith("builtins.pyi")


def test_references_are_sure_first(client: Client) -> None:
    found = client.ask("references", "shop.py", "total", context={"includeDeclaration": True})
    assert client.shown(found)[:2] == ["market.py:5:23-28", "market.py:15:18-23"]
    assert client.shown(found)[-1] == "market.py:26:17-22"
    uses = client.ask("references", "shop.py", "total", context={"includeDeclaration": False})
    assert "shop.py:10:8-13" not in client.shown(uses)
    assert len(uses) < len(found)


def test_highlights(client: Client) -> None:
    found = client.ask("documentHighlight", "market.py", "amount")
    assert [(at["range"]["start"]["line"], at["kind"]) for at in found] == [(15, 3), (16, 2)]


def test_hover_says_how_sure_it_is(client: Client) -> None:
    sure = client.ask("hover", "market.py", "total(2)")
    assert sure["contents"]["kind"] == "markdown"
    assert "def total(tax: float = 0) -> float" in sure["contents"]["value"]
    assert "What all of it costs." in sure["contents"]["value"]
    assert sure["range"] == {"start": {"line": 15, "character": 18}, "end": {"line": 15, "character": 23}}
    assert "likely" not in sure["contents"]["value"]
    guessed = client.ask("hover", "market.py", "amount\n")
    assert guessed is not None
    assert client.ask("hover", "market.py", "# What it") is None


def test_signatures(client: Client) -> None:
    help_ = client.ask("signatureHelp", "market.py", "total(2)", len("total(2"))
    [signature] = help_["signatures"]
    assert signature["label"] == "total(tax: float = 0) -> float"
    assert signature["parameters"] == [{"label": "tax: float = 0"}]
    assert (help_["activeSignature"], help_["activeParameter"]) == (0, 0)
    assert client.ask("signatureHelp", "market.py", "amount") is None


def test_completion_is_resolved(client: Client) -> None:
    answer = client.ask("completion", "market.py", "total(2)", 2)
    [item] = [each for each in answer["items"] if each["label"] == "total"]
    assert item["kind"] == 2
    assert "documentation" not in item
    whole = client.Ask("completionItem/resolve", item)
    assert "What all of it costs." in whole["documentation"]["value"]
    assert "tax" in whole["detail"]
    unknown = {"label": "other", "data": "of another list"}
    assert client.Ask("completionItem/resolve", unknown) == unknown
    order = [each["sortText"] for each in answer["items"]]
    assert order == sorted(order)


def test_outline_has_broken_definitions(client: Client) -> None:
    [shop] = client.ask("documentSymbol", "shop.py")
    assert (shop["name"], shop["kind"]) == ("Shop", 5)
    assert shop["range"]["start"] == {"line": 4, "character": 0}
    assert [(child["name"], child["kind"]) for child in shop["children"]] == [
        ("__init__", 6),
        ("total", 6),
        ("broken", 6),
    ]
    assert shop["children"][1]["detail"] == "(self, tax: float = 0) -> float"


def test_symbols_of_the_program(client: Client) -> None:
    found = client.Ask("workspace/symbol", {"query": "total"})
    assert [(at["name"], at["containerName"]) for at in found[:2]] == [
        ("total", "market.Market"),
        ("total", "shop.Shop"),
    ]
    assert client.Ask("workspace/symbol", {"query": "there_is_no_such_name"}) == []


def test_rename(client: Client) -> None:
    ready = client.ask("prepareRename", "market.py", "amount")
    assert ready == {
        "range": {"start": {"line": 15, "character": 4}, "end": {"line": 15, "character": 10}},
        "placeholder": "amount",
    }
    assert client.ask("prepareRename", "market.py", "# What it") is None
    with pytest.raises(Refused, match="outside of the program"):
        client.ask("prepareRename", "market.py", "print")
    answer = client.ask("rename", "market.py", "amount", newName="price")
    [change] = answer["documentChanges"]
    assert change["textDocument"] == {"uri": client.uri("market.py"), "version": 1}
    assert [edit["newText"] for edit in change["edits"]] == ["price", "price"]
    with pytest.raises(Refused, match="is no name that code can use") as refused:
        client.ask("rename", "market.py", "amount", newName="1x")
    assert refused.value.code == -32803


def test_call_hierarchy(client: Client) -> None:
    [item] = client.ask("prepareCallHierarchy", "market.py", "pay(shop")
    assert (item["name"], item["kind"]) == ("pay", 12)
    [caller] = client.Ask("callHierarchy/incomingCalls", {"item": item})
    assert caller["from"]["uri"] == client.uri("market.py")
    assert caller["fromRanges"] == [{"start": {"line": 20, "character": 0}, "end": {"line": 20, "character": 3}}]
    callees = client.Ask("callHierarchy/outgoingCalls", {"item": item})
    assert [call["to"]["name"] for call in callees] == ["total"]


def test_type_hierarchy(client: Client) -> None:
    [item] = client.ask("prepareTypeHierarchy", "market.py", "Market(")
    assert item["name"] == "Market"
    assert [at["name"] for at in client.Ask("typeHierarchy/supertypes", {"item": item})] == ["Shop"]
    assert [at["name"] for at in client.Ask("typeHierarchy/subtypes", {"item": item})] == ["Fair"]


def decoded(client: Client, data: list[int]) -> list[tuple[int, int, int, str, set[str]]]:
    legend = client.capabilities["semanticTokensProvider"]["legend"]
    tokens, line, column = [], 0, 0
    for at in range(0, len(data), 5):
        lines, columns, length, kind, modifiers = data[at : at + 5]
        line, column = line + lines, columns if lines else column + columns
        names = {name for bit, name in enumerate(legend["tokenModifiers"]) if modifiers >> bit & 1}
        tokens.append((line, column, length, legend["tokenTypes"][kind], names))
    return tokens


def test_semantic_tokens(client: Client) -> None:
    whole = decoded(client, client.ask("semanticTokens/full", "market.py")["data"])
    text = FILES["market.py"].splitlines()
    kinds = {text[line][column : column + length]: kind for line, column, length, kind, _ in whole}
    assert kinds["shop"] == "parameter"
    assert {name: kinds[name] for name in ("Shop", "Market", "total", "pay", "amount", "tax", "print", "super")} == {
        "Shop": "class",
        "Market": "class",
        "total": "method",
        "pay": "function",
        "amount": "variable",
        "tax": "parameter",
        "print": "function",
        "super": "class",
    }
    assert (0, 5, 4, "namespace", set()) in whole
    assert (3, 6, 6, "class", {"declaration"}) in whole
    assert any(kind == "function" and "defaultLibrary" in names for *_, kind, names in whole)
    span = {"start": {"line": 12, "character": 0}, "end": {"line": 16, "character": 0}}
    part = decoded(client, client.ask("semanticTokens/range", "market.py", range=span)["data"])
    assert part == [token for token in whole if 12 <= token[0] <= 16]


def test_folds(client: Client) -> None:
    found = client.ask("foldingRange", "market.py")
    assert {"startLine": 3, "endLine": 5} in found
    assert {"startLine": 13, "endLine": 14, "kind": "comment"} in found
    assert len({at["startLine"] for at in found}) == len(found)


def test_selections_grow(client: Client) -> None:
    place = client.at("market.py", "shop.total(2)", 6)["position"]
    [selection] = client.ask("selectionRange", "market.py", positions=[place])
    spans = []
    while selection:
        spans.append(selection["range"])
        selection = selection.get("parent")
    assert spans[0] == {"start": {"line": 15, "character": 18}, "end": {"line": 15, "character": 23}}
    assert spans[-1]["start"] == {"line": 0, "character": 0}
    for inner, outer in itertools.pairwise(spans):
        assert tuple(outer["start"].values()) <= tuple(inner["start"].values())
        assert tuple(outer["end"].values()) >= tuple(inner["end"].values())
        assert outer != inner


def test_hints(client: Client) -> None:
    span = {"start": {"line": 0, "character": 0}, "end": {"line": 40, "character": 0}}
    hints = {(at["position"]["line"], at["label"]): at for at in client.ask("inlayHint", "market.py", range=span)}
    assert hints[15, ": float"]["kind"] == 1
    assert hints[15, "tax="]["kind"] == 2
    assert hints[12, " -> float"]["position"] == {"line": 12, "character": 19}


def test_problems_are_told(client: Client) -> None:
    found = client.diagnostics("market.py", 1)
    assert [(at["code"], at["severity"], at["range"]["start"]["line"]) for at in found] == [
        ("unbound-name", 2, 21),
        ("unresolved-import", 2, 22),
    ]
    assert [(at["code"], at["severity"]) for at in client.diagnostics("shop.py", 1)] == [("syntax", 1)]


def test_problems_are_asked_for(folder: Path) -> None:
    with Client(folder, capabilities={"textDocument": {"diagnostic": {"dynamicRegistration": False}}}) as client:
        client.open("market.py")
        first = client.ask("diagnostic", "market.py")
        assert first["kind"] == "full"
        assert [at["code"] for at in first["items"]] == ["unbound-name", "unresolved-import"]
        again = client.ask("diagnostic", "market.py", previousResultId=first["resultId"])
        assert again == {"kind": "unchanged", "resultId": first["resultId"]}
        client.change("market.py", edit(21, 20, 21, 34, "fair"))
        later = client.ask("diagnostic", "market.py", previousResultId=first["resultId"])
        assert [at["code"] for at in later["items"]] == ["unresolved-import"]
        assert not [told for told in client.told if told.get("method") == "textDocument/publishDiagnostics"]


def test_a_client_that_understands_less(folder: Path) -> None:
    less: dict[str, Any] = {"workspace": {}, "textDocument": {"hover": {"contentFormat": ["plaintext"]}}}
    with Client(folder, capabilities=less) as client:
        client.open("shop.py")
        flat = client.ask("documentSymbol", "shop.py")
        assert [(at["name"], at["containerName"]) for at in flat][:2] == [("Shop", ""), ("__init__", "Shop")]
        hover = client.ask("hover", "shop.py", "total")
        assert hover["contents"]["kind"] == "plaintext"
        assert "```" not in hover["contents"]["value"]
        answer = client.ask("rename", "shop.py", "tax", newName="rate")
        assert set(answer) == {"changes"}


def test_progress_of_what_reads_the_program(client: Client) -> None:
    begin = len(client.told)
    client.Ask("workspace/symbol", {"query": "total", "workDoneToken": "mine"})
    # It has ended when the answer comes.
    told = [at["params"] for at in client.told[begin:] if at.get("method") == "$/progress"]
    assert [(at["token"], at["value"]["kind"]) for at in told] == [("mine", "begin"), ("mine", "end")]


# The server, telling at once what takes a while.
HASTY = [
    sys.executable,
    "-c",
    "import sys; from quillet.server import main, progress; progress.DELAY = 0; sys.exit(main.serve())",
]


def slow_program(folder: Path) -> Path:
    """One in which references take a while, the first time."""
    body = "".join(f"def f_{n}(a):\n    return Base().run(a.run(f_{n}))\n\n\n" for n in range(60))
    (folder / "base.py").write_text("class Base:\n    def run(self, x):\n        return x\n")
    for number in range(400):
        (folder / f"m_{number}.py").write_text(f"from base import Base\n\n\n{body}")
    return folder.resolve()


def test_progress_that_the_server_begins(tmp_path: Path) -> None:
    with Client(slow_program(tmp_path), command=HASTY) as client:
        client.open("base.py")
        found = client.ask("references", "base.py", "run", context={"includeDeclaration": True})
        assert len(found) == 1 + 2 * 60 * 400
        [created] = [at for at in client.told if at.get("method") == "window/workDoneProgress/create"]
        token = created["params"]["token"]
        told = [at["params"] for at in client.told if at.get("method") == "$/progress"]
        assert [(at["token"], at["value"]["kind"]) for at in told] == [(token, "begin"), (token, "end")]
        assert told[0]["value"] == {"kind": "begin", "title": "Looking for references", "cancellable": True}
    with Client(tmp_path.resolve(), command=HASTY, capabilities={"window": {}}) as client:
        client.open("base.py")
        client.ask("references", "base.py", "run", context={"includeDeclaration": True})
        assert not [at for at in client.told if "rogress" in at.get("method", "")]


@pytest.mark.parametrize("token", ["mine", 7, None])
def test_what_takes_long_is_taken_back_by_its_progress(tmp_path: Path, token: str | int | None) -> None:
    with Client(slow_program(tmp_path), command=HASTY) as client:
        client.open("base.py")
        asked = {**client.at("base.py", "run"), "context": {"includeDeclaration": True}}
        question = client.Begin(
            "textDocument/references", asked if token is None else {**asked, "workDoneToken": token}
        )
        begun = client.Wait(lambda told: told.get("method") == "$/progress")["params"]
        client.Tell("window/workDoneProgress/cancel", {"token": "of another"})
        client.Tell("window/workDoneProgress/cancel", {"token": begun["token"]})
        with pytest.raises(Refused) as refused:
            client.Answer(question)
        assert refused.value.code == -32800
        told = [at["params"]["value"]["kind"] for at in client.told if at.get("method") == "$/progress"]
        assert told == ["begin", "end"]


# ---- settings ----


def wait_for_codes(client: Client, codes: list[str]) -> None:
    client.Wait(
        lambda told: (
            told.get("method") == "textDocument/publishDiagnostics"
            and [at["code"] for at in told["params"]["diagnostics"]] == codes
        )
    )


def test_settings_of_the_project_and_of_the_client(tmp_path: Path) -> None:
    (tmp_path / "pyproject.toml").write_text('[tool.quillet]\ndiagnostics = ["syntax"]\n')
    (tmp_path / "a.py").write_text("import nowhere\nx = unbound\ndef f(:\n  pass\n")
    with Client(tmp_path.resolve(), settings={"quillet": {}}) as client:
        client.open("a.py")
        assert [at["code"] for at in client.diagnostics("a.py")] == ["syntax"]
        client.settings["quillet"] = {"diagnostics": ["unbound-name"]}
        client.Tell("workspace/didChangeConfiguration", {"settings": {}})
        wait_for_codes(client, ["unbound-name"])
        client.settings["quillet"] = {"diagnostics": "all"}
        client.Tell("workspace/didChangeConfiguration", {"settings": {}})
        said = client.Wait(lambda told: told.get("method") == "window/showMessage")["params"]["message"]
        assert said.startswith("quillet: the editor's settings: diagnostics must be true, false, or a list")


def test_a_mistake_in_the_project_file_is_told(tmp_path: Path) -> None:
    (tmp_path / "pyproject.toml").write_text("[tool.quillet]\n\nversion = 3\n")
    with Client(tmp_path.resolve()) as client:
        said = client.Wait(lambda told: told.get("method") == "window/showMessage")["params"]["message"]
        assert "pyproject.toml:3: version must be" in said
        client.open("x.py", "x = 1\nx\n")
        assert client.shown(client.ask("definition", "x.py", "x\n")) == ["x.py:0:0-1"]


def test_certainty_leaves_out(folder: Path) -> None:
    with Client(folder, given={"initializationOptions": {"certainty": "certain"}}) as client:
        found = client.ask("references", "shop.py", "total", context={"includeDeclaration": True})
        assert "market.py:26:17-22" not in client.shown(found)
        assert "market.py:15:18-23" in client.shown(found)


def test_settings_that_come_later_leave_the_first_ones_they_do_not_name(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("class A:\n    def f(self): pass\n\ndef g(x):\n    x.f()\n\nunbound\nx = (\n")
    given = {"initializationOptions": {"certainty": "certain", "diagnostics": ["syntax"]}}
    with Client(tmp_path.resolve(), given=given, settings={"quillet": {"diagnostics": ["unbound-name"]}}) as client:
        client.open("a.py")
        wait_for_codes(client, ["unbound-name"])
        found = client.ask("references", "a.py", "f(self)", context={"includeDeclaration": True})
        assert client.shown(found) == ["a.py:1:8-9"]
        client.settings["quillet"] = {"certainty": "by name", "diagnostics": ["syntax", "unbound-name"]}
        client.Tell("workspace/didChangeConfiguration", {"settings": {}})
        wait_for_codes(client, ["unbound-name", "syntax"])
        found = client.ask("references", "a.py", "f(self)", context={"includeDeclaration": True})
        assert client.shown(found) == ["a.py:1:8-9", "a.py:4:6-7"]


def test_python_2_and_type_comments(tmp_path: Path) -> None:
    text = "print 'old'\nx = u'a' <> 3L\ndef f(a, b):\n    # type: (int, str) -> str\n    return b\nf(1, '').upper()\n"
    (tmp_path / "pyproject.toml").write_text('[tool.quillet]\nversion = "2.7"\n')
    with Client(tmp_path.resolve()) as client:
        client.open("a.py", text)
        assert client.diagnostics("a.py") == []
        assert "def f(a: int, b: str) -> str" in client.ask("hover", "a.py", "f(1")["contents"]["value"]
        assert "def upper()" in client.ask("hover", "a.py", "upper")["contents"]["value"]
        client.open("b.py", "x = ...\nx: int\n")
        assert [at["code"] for at in client.diagnostics("b.py")][:1] == ["syntax"]


def test_excluded_files_and_folders_that_come_and_go(tmp_path: Path) -> None:
    one, two = (tmp_path / "one").resolve(), (tmp_path / "two").resolve()
    for at in (one, two):
        at.mkdir()
        (at / f"mod_{at.name}.py").write_text("def here(): pass\n")
    (one / "left_out.py").write_text("def here(): pass\n")
    (one / "pyproject.toml").write_text('[tool.quillet]\nexclude = ["left_out.py"]\n')
    (one / ".gitignore").write_text("made/\n")
    (one / "made").mkdir()
    (one / "made" / "ignored.py").write_text("def here(): pass\n")
    with Client(one) as client:

        def names() -> list[str]:
            found = client.Ask("workspace/symbol", {"query": "here"})
            return sorted(Path(at["location"]["uri"]).name for at in found)

        assert names() == ["mod_one.py"]
        folder = {"uri": two.as_uri(), "name": "two"}
        client.Tell("workspace/didChangeWorkspaceFolders", {"event": {"added": [folder], "removed": []}})
        assert names() == ["mod_one.py", "mod_two.py"]
        client.Tell("workspace/didChangeWorkspaceFolders", {"event": {"added": [], "removed": [folder]}})
        assert names() == ["mod_one.py"]
        (one / "pyproject.toml").write_text("[tool.quillet]\n")
        (one / "more.py").write_text("def here(): pass\n")
        changes = [{"uri": client.uri("pyproject.toml"), "type": 2}, {"uri": client.uri("more.py"), "type": 1}]
        client.Tell("workspace/didChangeWatchedFiles", {"changes": changes})
        assert names() == ["left_out.py", "mod_one.py", "more.py"]
