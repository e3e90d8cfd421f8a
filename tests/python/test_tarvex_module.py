"""The module as a whole: one interpreter, every name, declared types, threads side by side."""

from __future__ import annotations

import ast
import subprocess
import sys
import textwrap
import threading
from pathlib import Path

import pytest

import quillet
from quillet import logicalline, symbolinfo, tarvex
from quillet.tarvex import CPGenAnalyzerImpl

PACKAGE = Path(quillet.__file__).parent


def test_a_second_interpreter_is_refused() -> None:
    script = textwrap.dedent(
        """
        import quillet.tarvex
        try:
            import _interpreters as interpreters
        except ImportError:
            import _xxsubinterpreters as interpreters
        import sys

        inner = f'''
        import sys
        sys.path[:] = {sys.path!r}
        try:
            import quillet.tarvex
        except ImportError as error:
            print("refused:", error)
        else:
            print("loaded")
        '''.replace("\\n        ", "\\n")
        interpreters.run_string(interpreters.create(), inner)
        """
    )
    result = subprocess.run([sys.executable, "-c", script], capture_output=True, text=True, check=True)
    assert result.stdout.startswith("refused: ")


def names_declared(module: str) -> dict[str, set[str]]:
    """The names of a stub, with those of each class."""
    tree = ast.parse((PACKAGE / f"{module}.pyi").read_text(encoding="utf-8"))
    found: dict[str, set[str]] = {}
    for statement in tree.body:
        if isinstance(statement, ast.ClassDef):
            found[statement.name] = set()
            for inner in statement.body:
                if isinstance(inner, ast.FunctionDef | ast.ClassDef):
                    found[statement.name].add(inner.name)
                elif isinstance(inner, ast.AnnAssign) and isinstance(inner.target, ast.Name):
                    found[statement.name].add(inner.target.id)
        elif isinstance(statement, ast.FunctionDef):
            found[statement.name] = set()
        elif isinstance(statement, ast.AnnAssign) and isinstance(statement.target, ast.Name):
            found[statement.target.id] = set()
    return found


# Fields that only an object has, of classes written in Python.
OF_INSTANCES = {"CLocationCache": ["_fBuiltinLoc"]}
# What a module written in Python imports for itself.
IMPORTED = {"Any", "annotations", "_siblings"}


@pytest.mark.parametrize("module", ["tarvex", "logicalline", "symbolinfo"])
def test_every_name_is_declared_and_every_declared_name_is_there(module: str) -> None:
    declared = names_declared(module)
    actual = {"tarvex": tarvex, "logicalline": logicalline, "symbolinfo": symbolinfo}[module]
    protocols = {"_HasSymbols", "_HasLine", "_HasPlace", "_LineTexts", "_Siblings"}
    for name, members in declared.items():
        if name in protocols:
            continue
        assert hasattr(actual, name), name
        for member in members - set(OF_INSTANCES.get(name, ())):
            assert hasattr(getattr(actual, name), member), f"{name}.{member}"
    dunders = {name for name in vars(actual) if name.startswith("__") and name.endswith("__")}
    assert set(vars(actual)) - dunders - IMPORTED - set(declared) == set()
    for name, value in vars(actual).items():
        if isinstance(value, type):
            own = {member for member in vars(value) if not (member.startswith("__") and member.endswith("__"))}
            missing = {m for m in own if not any(m in declared.get(base.__name__, ()) for base in value.__mro__)}
            assert missing == set(), name


def test_the_package_shows_what_there_is_for_others() -> None:
    script = "import quillet; before = dir(quillet); quillet.analyze('a'); print(before, dir(quillet), sep='\\n')"
    result = subprocess.run([sys.executable, "-c", script], capture_output=True, text=True, check=True)
    before, behind = ([n for n in ast.literal_eval(row) if n[:2] != "__"] for row in result.stdout.splitlines())
    assert before == sorted(quillet.__all__)
    modules = set(behind) - set(before)
    assert modules  # those that the analysis loaded
    assert all((PACKAGE / f"{name}.py").exists() or name == "tarvex" for name in modules)
    assert all(hasattr(quillet, name) for name in dir(quillet))


def test_an_analyzer_a_thread() -> None:
    source = "\n".join(f"name_{i} = call_{i}(arg, [x for x in y if x.{'a' * (i % 7 + 1)}])" for i in range(300))
    expected = None
    results: list[object] = []

    def work() -> None:
        analyzer = CPGenAnalyzerImpl((3, 8))
        lines = logicalline.GetLogicalsFromText(source, (3, 8))
        errors = [analyzer.AnalyzeSingleLogical(line, False) for line in lines]
        results.append((errors, [line.fTypeEquivs for line in lines]))

    work()
    expected = results.pop()
    threads = [threading.Thread(target=work) for _ in range(4)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert results == [expected] * 4


def test_no_operation_takes_none_for_an_object_of_its_own() -> None:
    # A missing check for None in a binding would not raise but crash.
    analyzer = CPGenAnalyzerImpl((3, 8))
    walker = tarvex.CNodeWalker((3, 8))
    parser = analyzer._fLogicalParser
    calls = [
        lambda: analyzer.AnalyzeSingleLogical(None, False),
        lambda: analyzer.ParseToNode(None, False),
        lambda: analyzer._InspectSingleLogical(None, False),
        lambda: parser.ParseToNode(None, False),
        lambda: parser.ParseToksToNode(None, False, None),
        lambda: tarvex.CMatchCaseStatementParser(None),
        lambda: tarvex.CNodeWalker(None),
        lambda: tarvex.CPGenAnalyzerImpl(None),
        lambda: walker._VisitNode(None),
        lambda: walker._ProcessFunctionCall("f", None),
        lambda: walker._ProcessFunctionCall("f", [None]),
        lambda: walker._ProcessDefiningArgList([None]),
        lambda: walker._VisitAtomPlusTrailers(None, []),
        lambda: analyzer._fTypeHintWalker.Walk(None, None, False),
        lambda: analyzer._fTypeHintWalker._ProcessArgSpecificComment(None),
        lambda: tarvex.IsSetLiteral(None),
        lambda: tarvex.GetTokenEndIndex(None),
        lambda: tarvex.GetDefiningArgInfoList(None),
        lambda: tarvex.CNodeClassInfo(None, 1, None),
        lambda: tarvex.CAtom.GetInitialBracket(None),
        lambda: logicalline.IsScopeStartLogical(None),
        lambda: logicalline.GetLogicalsFromText(None),
        lambda: tarvex._host.AnalyzedSource(None, None),
    ]
    for call in calls:
        with pytest.raises(TypeError):
            call()
