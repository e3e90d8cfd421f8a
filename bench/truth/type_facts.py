"""TypeEvalPy's micro-benchmark: the types of variables, parameters and what functions return, in small programs.

Each program is a folder with a `main.py` and a `main_gt.json` of facts: a line, a column, the name of a variable, a
parameter or a function, and its types. A variable's or parameter's types are asked for where it stands, those of
`x[0]` and `x['a']` in a line put behind the statement, and what a function returns is read from its own type.
"""

from __future__ import annotations

import argparse
import ast
import json
import re
from pathlib import Path
from typing import Any

from bench.truth.engine import ENGINES, AddEngine, Engine
from bench.truth.halves import AddHalf, InHalf
from bench.truth.places import Cut, Place, ReadText
from bench.truth.tally import AddFailures, Tally

HOW_TO_GET = (
    "git clone https://github.com/secure-software-engineering/TypeEvalPy; the folder is TypeEvalPy/micro-benchmark"
)
_DOTTED = re.compile(r"[\w.]+\Z")
# What the set calls a few types.
_NAMES = {"nonetype": "None", "none": "None", "code": "types.CodeType", "any": "typing.Any"}


def Parts(text: str, separator: str) -> list[str]:
    """A text cut at a separator that stands in no bracket."""
    parts, depth = [""], 0
    for character in text:
        depth += (character in "([{") - (character in ")]}")
        if character == separator and depth == 0:
            parts.append("")
        else:
            parts[-1] += character
    return [part.strip() for part in parts if part.strip()]


def Returned(types: list[str]) -> list[str]:
    """What the functions among some types return: the members of what stands behind the last arrow outside brackets."""
    found: list[str] = []
    for text in types:
        if text.startswith(("def ", "async def ")):
            depth = 0
            for at, character in enumerate(text):
                depth += (character in "([{") - (character in ")]}")
                if depth == 0 and text.startswith("->", at):
                    rest = text[at + 2 :].strip()
                    found += [rest] if rest.startswith("def ") else map(_Bare, Parts(rest, "|"))
                    break
    return found


def _Bare(text: str) -> str:
    """A type without the brackets that a function has in a union."""
    return text[1:-1] if text.startswith("(") and text.endswith(")") else text


def Same(expected: str, given: str) -> bool:
    """Whether a type is the one that the set names: `callable` is any function, `A` any class of this name."""
    if expected.lower() == "callable":
        return given.startswith(("def ", "type[")) or given.split("[")[0].rpartition(".")[2] == "Callable"
    expected = _NAMES.get(expected.lower(), expected)
    plain = given.split("[")[0]
    return plain == expected or plain.endswith(f".{expected}")


def Agree(expected: list[str], given: list[str]) -> bool:
    return (
        bool(given)
        and all(any(Same(wanted, each) for each in given) for wanted in expected)
        and all(any(Same(wanted, each) for wanted in expected) for each in given)
    )


def PlaceBehind(text: str, line: int, expression: str) -> tuple[str, int, int] | None:
    """The text with `asked_ = expression` behind the statement of a line, and where `asked_` stands in it."""
    best: ast.stmt | None = None
    for node in ast.walk(ast.parse(text)):
        if isinstance(node, ast.stmt) and not hasattr(node, "body") and node.lineno <= line <= (node.end_lineno or 0):
            best = node
    if best is None:
        return None
    lines = Cut(text)
    end = best.end_lineno or line
    lines.insert(end, " " * best.col_offset + f"asked_ = {expression}")
    return "\n".join(lines), end + 1, best.col_offset


def Types(engine: Engine, path: Path, fact: dict[str, Any]) -> list[str]:
    """What the engine says to a fact."""
    line, column = fact["line_number"], fact["col_offset"] - 1
    name = fact.get("parameter") or fact.get("variable")
    if name is None:
        return Returned(engine.Types(Place(str(path), line, column)))
    if _DOTTED.match(name):
        return engine.Types(Place(str(path), line, column + len(name) - len(name.rpartition(".")[2])))
    changed = PlaceBehind(ReadText(path), line, name)
    if changed is None:
        return []
    text, line, column = changed
    engine.Open(str(path), text)
    types = engine.Types(Place(str(path), line, column))
    engine.Close(str(path))
    return types


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("typeeval", help="TypeEvalPy's facts", description=f"{__doc__}\n{HOW_TO_GET}.")
    parser.add_argument("folder", type=Path, help=HOW_TO_GET)
    AddHalf(parser)
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    folder = options.folder.resolve()
    tally = Tally("Types of variables, parameters and returns (TypeEvalPy)", {"all": None}, failures=options.failures)
    for truth in sorted(folder.rglob("*_gt.json")):
        key = truth.parent.relative_to(folder).as_posix()
        if not InHalf(key, options.half):
            continue
        engine = ENGINES[options.engine]([truth.parent])
        for fact in json.loads(truth.read_text()):
            group = next(kind for kind in ("parameter", "variable", "function") if kind in fact)
            given = Types(engine, truth.parent / fact["file"], fact)
            place = f"{fact['file']}:{fact['line_number']}:{fact['col_offset']} {fact[group]}"
            tally.Add(f"{group}s", f"{key} {place}", Agree(fact["type"], given), fact["type"], given)
        tally.Note("programs")
    return tally.Report()
