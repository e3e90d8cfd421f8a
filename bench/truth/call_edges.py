"""PyCG's micro-benchmark: which function of a small program calls which.

Each program is a folder with a `main.py` and a `callgraph.json` that has, for each function, what it calls. A workspace
is asked for the callees and the callers of every function, of every lambda and of the modules; what either says is an
edge. Functions have the set's own names: `main.A.func`, `main.<lambda1>`, `<builtin>.len`; a class that is called is
its `__init__`.
"""

from __future__ import annotations

import argparse
import ast
import json
import re
from collections import Counter
from pathlib import Path
from typing import NamedTuple

from bench.truth.engine import ENGINES, AddEngine, Engine
from bench.truth.halves import AddHalf, InHalf
from bench.truth.places import Call, Cut, Found, Place, ReadText
from bench.truth.tally import AddFailures, Tally

HOW_TO_GET = "git clone https://github.com/vitsalis/PyCG; the folder is PyCG/micro-benchmark/snippets"

Edge = tuple[str, str]
_Definition = ast.FunctionDef | ast.AsyncFunctionDef | ast.ClassDef | ast.Lambda


class Function(NamedTuple):
    """A module, class, function or lambda of a program: where its name or the word `lambda` stands, and its body."""

    name: str
    place: Place
    is_class: bool
    first: tuple[int, int]
    last: tuple[int, int]


class Program:
    """The functions of a program's files, and which of them is around a place."""

    def __init__(self, folder: Path) -> None:
        self.folder = folder
        self.functions: list[Function] = []
        self._bases: dict[str, list[str]] = {}
        self._imported: dict[Place, str] = {}
        self._modules: dict[str, str] = {}
        for path in sorted(folder.rglob("*.py")):
            parts = path.relative_to(folder).with_suffix("").parts
            module = ".".join(parts[:-1] if parts[-1] == "__init__" and len(parts) > 1 else parts)
            self._Read(str(path), module, ReadText(path))
        self._by_place = {each.place: each for each in self.functions}
        self._names = {each.name: each for each in self.functions}

    def _Read(self, path: str, module: str, text: str) -> None:
        lines = Cut(text)
        # A module is asked about behind its last line, and named by its first place.
        self.functions.append(Function(module, Place(path, len(lines) + 1, 0), False, (1, 0), (len(lines) + 1, 0)))
        self._modules[path] = module
        self._Visit(ast.parse(text), path, module, lines, Counter())

    def _Visit(self, node: ast.AST, path: str, inside: str, lines: list[str], lambdas: Counter[str]) -> None:
        for child in ast.iter_child_nodes(node):
            name = inside
            if isinstance(child, ast.FunctionDef | ast.AsyncFunctionDef | ast.ClassDef):
                name = f"{inside}.{child.name}"
                head = re.compile(r"(async\s+)?(def|class)\s+").match(lines[child.lineno - 1], child.col_offset)
                column = head.end() if head else child.col_offset
                self._Add(child, name, Place(path, child.lineno, column))
                if isinstance(child, ast.ClassDef):
                    self._bases[name] = [ast.unparse(base) for base in child.bases]
            elif isinstance(child, ast.Lambda):
                lambdas[inside] += 1
                name = f"{inside}.<lambda{lambdas[inside]}>"
                self._Add(child, name, Place(path, child.lineno, child.col_offset))
            elif isinstance(child, ast.ImportFrom) and child.module and not child.level:
                for alias in child.names:
                    full = f"{child.module}.{alias.name}"
                    line = lines[alias.lineno - 1]
                    self._imported[Place(path, alias.lineno, alias.col_offset)] = full
                    if alias.asname and alias.end_col_offset is not None:
                        column = len(line.encode()[: alias.end_col_offset].decode()) - len(alias.asname)
                        self._imported[Place(path, alias.lineno, column)] = full
            self._Visit(child, path, name, lines, lambdas)

    def _Add(self, node: _Definition, name: str, place: Place) -> None:
        body = [node.body] if isinstance(node, ast.Lambda) else node.body
        first = (body[0].lineno, body[0].col_offset)
        last = (body[-1].end_lineno or 0, body[-1].end_col_offset or 0)
        self.functions.append(Function(name, place, isinstance(node, ast.ClassDef), first, last))

    def Around(self, place: Place) -> str | None:
        """The innermost function whose body a place is in. What the body of a class does is done by what is around."""
        around = None
        for each in self.functions:  # an inner one stands behind the one around it
            if each.place.path == place.path and not each.is_class and each.first <= place[1:] < each.last:
                around = each.name
        return around

    def Name(self, found: Found) -> str | None:
        """What the set calls a place that was given as what is called."""
        function = self._by_place.get(found.place)
        if function is not None:
            return self._Constructor(function.name) if function.is_class else function.name
        if found.place in self._imported:
            return self._imported[found.place]
        path = Path(found.path)
        return None if path.is_relative_to(self.folder) else ForeignName(found)

    def Callers(self, call: Call, function: Found) -> set[str | None]:
        """Who calls: what is around each place where it does so, or else the function that was given for it."""
        return {self.Around(site) for site in call.sites} or {self._Caller(function)}

    def _Caller(self, found: Found) -> str | None:
        if found.kind == "module":
            return self._modules.get(found.path)
        function = self._by_place.get(found.place)
        return function.name if function else self.Around(found.place)

    def _Constructor(self, name: str, seen: frozenset[str] = frozenset()) -> str | None:
        """The `__init__` that calling a class runs; None where the program has none."""
        if f"{name}.__init__" in self._names:
            return f"{name}.__init__"
        for base in self._bases.get(name, ()):
            scope = name
            while "." in scope:
                scope = scope.rpartition(".")[0]
                around = f"{scope}.{base}"
                if around in self._bases and around not in seen:
                    return self._Constructor(around, seen | {name})
        return None


def ForeignName(found: Found) -> str:
    """The name of what stands in no file of the program, by the definitions around it: `<builtin>.len`."""
    path = Path(found.path)
    scopes: list[str] = []
    indent = found.column + 1
    lines = Cut(ReadText(path))
    for number in range(found.line, 0, -1):
        line = lines[number - 1] if number <= len(lines) else ""
        inside = len(line) - len(line.lstrip())
        if line.strip() and inside < indent:
            indent = inside
            if head := re.match(r"\s*(?:async\s+)?(?:def|class)\s+(\w+)", line):
                scopes.insert(0, head[1])
        if indent == 0:
            break
    name = lines[found.line - 1][found.column : found.end] if found.line <= len(lines) else ""
    module = "<builtin>" if path.stem == "builtins" else path.stem
    if not scopes or scopes[-1] != name:
        scopes.append(name)
    return ".".join((module, *scopes))


def Expected(folder: Path) -> set[Edge]:
    graph = json.loads((folder / "callgraph.json").read_text())
    return {(caller, callee) for caller, callees in graph.items() for callee in callees}


def Given(program: Program, engine: Engine) -> dict[Edge, str]:
    """Each edge with the strongest certainty that an answer gives it."""
    order = ("certain", "likely", "by name")
    edges: dict[Edge, str] = {}

    def Add(caller: str | None, callee: str | None, certainty: str) -> None:
        if caller and callee:
            edge = (caller, callee)
            if edge not in edges or order.index(certainty) < order.index(edges[edge]):
                edges[edge] = certainty

    for function in program.functions:
        if not function.is_class:
            for call in engine.Callees(function.place):
                for caller in program.Callers(call, Found(*function.place, end=0)):
                    # What no file of the program defines has the name that the import gives it.
                    foreign = call.function.role == "import"
                    Add(caller, call.name if foreign else program.Name(call.function), call.function.certainty)
        called = program.Name(Found(*function.place, end=function.place.column))
        for call in engine.Callers(function.place):
            for caller in program.Callers(call, call.function):
                Add(caller, called, call.function.certainty)
    return edges


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("pycg", help="call edges of PyCG's programs", description=f"{__doc__}\n{HOW_TO_GET}.")
    parser.add_argument("folder", type=Path, help=HOW_TO_GET)
    AddHalf(parser)
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    folder = options.folder.resolve()
    tally = Tally("Call edges (PyCG)", {"edges": 95}, failures=options.failures)
    for graph in sorted(folder.rglob("callgraph.json")):
        key = graph.parent.relative_to(folder).as_posix()
        if not InHalf(key, options.half):
            continue
        program = Program(graph.parent)
        expected = Expected(graph.parent)
        given = Given(program, ENGINES[options.engine]([graph.parent]))
        for edge in sorted(expected):
            tally.Add("edges", f"{key}: {' -> '.join(edge)}", edge in given, " -> ".join(edge), map(" -> ".join, given))
        for edge, certainty in sorted(given.items()):
            if edge not in expected:
                tally.Fault(
                    f"edges that the set has not, {certainty}",
                    f"{key}: {' -> '.join(edge)}",
                    map(" -> ".join, expected),
                    most=0 if certainty == "certain" else None,
                )
        tally.Note("programs")
    return tally.Report()
