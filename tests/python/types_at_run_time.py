"""What names and attributes of a program are while it runs: the truth that inferred types are held against.

A program is run with every name and attribute that it reads handed through a probe, which notes the types of what
comes by. What a workspace says of the same places has to have all of them: it may know less exactly (a base class, a
protocol of the library, a type that another run would give), but never something else, and never nothing. A line that
ends in `# unknown` holds a place of which that is not so yet; one that does not any more is a mistake, too.
"""

from __future__ import annotations

import ast
import collections
import contextlib
import io
import re
import sys
import types
from pathlib import Path
from typing import Any, NamedTuple

from quillet import Workspace

_FUNCTIONS = (
    types.FunctionType,
    types.BuiltinFunctionType,
    types.MethodType,
    types.WrapperDescriptorType,
    types.MethodWrapperType,
    types.MethodDescriptorType,
    types.ClassMethodDescriptorType,
)
# What the interpreter calls otherwise than the stubs do.
_NAMES_OF_STUBS = {
    "generator": "Generator",
    "coroutine": "Coroutine",
    "async_generator": "AsyncGenerator",
    "ellipsis": "EllipsisType",
    "mappingproxy": "MappingProxyType",
}
# What stubs say in general of what is a class of its own at run time.
_GENERAL = {
    "Any",
    "Callable",
    "Generator",
    "ItemsView",
    "Iterable",
    "Iterator",
    "KeysView",
    "Mapping",
    "Sequence",
    "def",
}
# Names that mean something to the interpreter only where they stand.
_LEFT_ALONE = {"super", "__class__", "locals", "globals"}
_OF_TYPING = {"Generic", "NamedTuple", "Protocol", "TypedDict"}


class Place(NamedTuple):
    line: int
    column: int  # from 1, in bytes


class Seen(NamedTuple):
    """A type that a place had, by the names that answers may have for it."""

    name: str
    bases: frozenset[str]


class _Prober(ast.NodeTransformer):
    """Hands what a program reads to `__probe__`, with the number of its place."""

    def __init__(self) -> None:
        self.places: list[Place] = []

    def _Probed(self, node: ast.expr, line: int, offset: int) -> ast.expr:
        self.places.append(Place(line, offset + 1))
        number = ast.Constant(len(self.places) - 1)
        return ast.copy_location(ast.Call(ast.Name("__probe__", ast.Load()), [number, node], []), node)

    def visit_Name(self, node: ast.Name) -> ast.AST:
        if not isinstance(node.ctx, ast.Load) or node.id in _LEFT_ALONE | _OF_TYPING:
            return node
        return self._Probed(node, node.lineno, node.col_offset)

    def visit_Attribute(self, node: ast.Attribute) -> ast.AST:
        self.generic_visit(node)
        if not isinstance(node.ctx, ast.Load) or node.end_lineno is None or node.end_col_offset is None:
            return node
        return self._Probed(node, node.end_lineno, node.end_col_offset - len(node.attr.encode()))

    def visit_Call(self, node: ast.Call) -> ast.AST:
        if isinstance(node.func, ast.Name) and node.func.id in {*_LEFT_ALONE, "TypeVar", "ParamSpec", "NewType"}:
            return node
        return self.generic_visit(node)

    def visit_arguments(self, node: ast.arguments) -> ast.AST:
        node.defaults = [self.visit(default) for default in node.defaults]
        node.kw_defaults = [default and self.visit(default) for default in node.kw_defaults]
        return node

    def visit_FunctionDef(self, node: Any) -> ast.AST:
        self.visit(node.args)
        node.body = [self.visit(statement) for statement in node.body]
        node.decorator_list = [self.visit(decorator) for decorator in node.decorator_list]
        return node

    visit_AsyncFunctionDef = visit_FunctionDef

    def visit_ClassDef(self, node: ast.ClassDef) -> ast.AST:
        node.body = [self.visit(statement) for statement in node.body]
        return node

    def visit_AnnAssign(self, node: ast.AnnAssign) -> ast.AST:
        if node.value is not None:
            node.value = self.visit(node.value)
        return node

    def visit_match_case(self, node: Any) -> ast.AST:
        if node.guard is not None:
            node.guard = self.visit(node.guard)
        node.body = [self.visit(statement) for statement in node.body]
        return node

    def visit_JoinedStr(self, node: ast.JoinedStr) -> ast.AST:
        return node  # its places are those of the string in older versions

    def visit_TypeAlias(self, node: ast.AST) -> ast.AST:
        return node


def _SeenOf(value: object) -> Seen:
    if value is None:
        return Seen("None", frozenset())
    if isinstance(value, types.ModuleType):
        return Seen("module " + value.__name__.rpartition(".")[2], frozenset())
    if isinstance(value, _FUNCTIONS):
        return Seen("def", frozenset())
    if isinstance(value, type):
        bases = {f"type[{base.__name__}]" for base in value.__mro__[:-1]}
        return Seen(f"type[{value.__name__}]", frozenset(bases | {base.__name__ for base in type(value).__mro__[:-1]}))
    name = type(value).__name__
    return Seen(_NAMES_OF_STUBS.get(name, name), frozenset(base.__name__ for base in type(value).__mro__[:-1]))


def SeenTypes(path: Path) -> dict[Place, set[Seen]]:
    """Runs a program; what each place that it reads was."""
    prober = _Prober()
    tree = ast.fix_missing_locations(prober.visit(ast.parse(path.read_text("utf-8"))))
    seen: dict[Place, set[Seen]] = collections.defaultdict(set)

    def Probe(number: int, value: object) -> object:
        seen[prober.places[number]].add(_SeenOf(value))
        return value

    module = types.ModuleType(path.stem)
    module.__dict__.update(__probe__=Probe, __file__=str(path))
    sys.modules[path.stem] = module
    try:
        with contextlib.redirect_stdout(io.StringIO()):
            exec(compile(tree, str(path), "exec"), module.__dict__)
    finally:
        del sys.modules[path.stem]
    return seen


def _Last(text: str) -> str:
    return text.split("[")[0].rpartition(".")[2]


def NameOfAnswer(text: str) -> str:
    if text.startswith(("def ", "async def ")):
        return "def"
    if inside := re.fullmatch(r"type\[(.*)\]", text):
        return f"type[{_Last(inside[1])}]"
    return "module " + _Last(text[7:]) if text.startswith("module ") else _Last(text)


def Unlike(path: Path, workspace: Workspace) -> tuple[int, list[str]]:
    """How many places a program has, and what is said of them that is not so, or said where a line denies it."""
    lines = path.read_text("utf-8").splitlines()
    seen = SeenTypes(path)
    mistakes: list[str] = []
    unknown: set[int] = set()
    for place, wanted in sorted(seen.items()):
        answers = workspace.types(str(path), place.line, place.column)
        given = {NameOfAnswer(text) for text in answers}
        missing = [each.name for each in wanted if each.name not in given and not each.bases & given]
        if not missing or given & _GENERAL or any(text.isidentifier() for text in answers):  # a type variable
            continue
        unknown.add(place.line)
        if not lines[place.line - 1].endswith("# unknown"):
            at = f"{path.name}:{place.line}:{place.column}"
            mistakes.append(
                f"{at}: is {', '.join(sorted(missing))}, said to be {', '.join(sorted(given)) or 'nothing'}"
            )
    for number, line in enumerate(lines, 1):
        if line.endswith("# unknown") and number not in unknown:
            mistakes.append(f"{path.name}:{number}: is known")
    return len(seen), mistakes
