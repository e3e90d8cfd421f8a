"""What `ast` says of files, as nodes that quillet's trees can be put beside: see tree_agreement.py.

`main` is for other Pythons, from 3.10 on: it reads pickles of sources, as bytes and as UTF-8, and writes one of the
nodes of each.
"""

from __future__ import annotations

import ast
import pickle
import re
import sys
import warnings
from collections.abc import Iterable, Iterator, Sequence
from dataclasses import dataclass, field
from typing import Any

VERSION = sys.version_info[:2]
LINE_END = re.compile(rb"\r\n|\r|\n")
ASYNC_STMT, EXCEPT_GROUP = 1, 2
# For trees that are as deep as their sums are long.
RECURSION_LIMIT = 20_000


@dataclass
class Node:
    """What is compared. `begin` and `end` are offsets in bytes, None where one of the two does not say them."""

    kind: str
    detail: tuple[Any, ...] = ()
    begin: int | None = None
    end: int | None = None
    children: list[Node | None] = field(default_factory=list)


class Reference:
    """What `ast` says, in the same form."""

    def __init__(self, source: bytes) -> None:
        """`source` is UTF-8."""
        self.source = source
        self.starts = [0, *(match.end() for match in LINE_END.finditer(source))]
        if source.startswith(b"\xef\xbb\xbf"):
            self.starts[0] = 3
        self.has_places = True

    def place(self, line: int, column: int) -> int | None:
        return self.starts[line - 1] + column if self.has_places else None

    def node(self, kind: str, detail: tuple[Any, ...], at: Any, children: Sequence[Node | None]) -> Node:
        begin = self.place(at.lineno, at.col_offset)
        return Node(kind, detail, begin, self.place(at.end_lineno, at.end_col_offset), list(children))

    # -- statements --

    def block(self, body: Iterable[ast.stmt]) -> list[Node | None]:
        return [node for stmt in body for node in self.statement(stmt)]

    def with_block(self, node: Node, body: Iterable[ast.stmt]) -> Node:
        block = self.block(body)
        node.children.append(Node("Block", children=block))
        if block and block[-1] is not None:
            node.end = block[-1].end
        return node

    def head(self, kind: str, at: Any, exprs: Sequence[Node | None], body: Iterable[ast.stmt], flags: int = 0) -> Node:
        return self.with_block(self.node(kind, (flags,), at, exprs), body)

    def bare(self, kind: str, body: list[ast.stmt]) -> Iterator[Node]:
        """A clause that has no place of its own."""
        if body:
            yield self.with_block(Node(kind, (0,)), body)

    def statement(self, stmt: ast.stmt) -> Iterator[Node]:
        def simple(kind: str, exprs: Sequence[Node | None], *detail: object) -> Node:
            return self.node(kind, (0, *detail), stmt, [*exprs, Node("Block")])

        match stmt:
            case ast.FunctionDef() | ast.AsyncFunctionDef():
                yield self.definition(stmt)
            case ast.ClassDef():
                arguments = self.arguments([*stmt.bases, *stmt.keywords])
                yield self.named(stmt, "Class", 0, arguments)
            case ast.Return(value):
                yield simple("Return", self.optional(value))
            case ast.Delete(targets):
                yield simple("Delete", self.all(targets))
            case ast.Assign(targets, value):
                yield simple("Assign", self.all([*targets, value]))
            case ast.AugAssign(target, op, value):
                yield simple("AugmentedAssign", self.all([target, value]), type(op).__name__)
            case ast.AnnAssign(target, annotation, value):
                hint = Node("Hint", children=[self.expr(annotation)])
                yield simple("Annotated", [self.expr(target), *self.optional(value), hint])
            case ast.For(target, iterable, body, orelse) | ast.AsyncFor(target, iterable, body, orelse):
                flags = ASYNC_STMT if isinstance(stmt, ast.AsyncFor) else 0
                yield self.head("For", stmt, self.all([target, iterable]), body, flags)
                yield from self.bare("Else", orelse)
            case ast.While(test, body, orelse):
                yield self.head("While", stmt, [self.expr(test)], body)
                yield from self.bare("Else", orelse)
            case ast.If(test, body, orelse):
                place = self.place(stmt.lineno, stmt.col_offset) or 0
                kind = "Elif" if self.source.startswith(b"elif", place) else "If"
                yield self.head(kind, stmt, [self.expr(test)], body)
                if len(orelse) == 1 and isinstance(orelse[0], ast.If):
                    place = self.place(orelse[0].lineno, orelse[0].col_offset) or 0
                    if self.source.startswith(b"elif", place):
                        yield from self.statement(orelse[0])
                        return
                yield from self.bare("Else", orelse)
            case ast.With(items, body) | ast.AsyncWith(items, body):
                flags = ASYNC_STMT if isinstance(stmt, ast.AsyncWith) else 0
                nodes: list[Node | None] = [
                    Node("WithItem", children=[self.expr(item.context_expr), *self.optional(item.optional_vars)])
                    for item in items
                ]
                yield self.head("With", stmt, nodes, body, flags)
            case ast.Raise(exc, cause):
                yield simple("Raise", self.optional(exc) + self.optional(cause))
            case ast.Assert(test, msg):
                yield simple("Assert", [self.expr(test), *self.optional(msg)])
            case ast.Import(names):
                yield simple("Import", [self.alias(alias, True) for alias in names])
            case ast.ImportFrom(module, names, level):
                path = self.path(module or "", level)
                yield simple("FromImport", [path, *(self.alias(alias, False) for alias in names)])
            case ast.Global(names) | ast.Nonlocal(names):
                yield simple(type(stmt).__name__, [Node("Name", (name, False)) for name in names])
            case ast.Expr(value):
                yield simple("Expression", [self.expr(value)])
            case ast.Pass() | ast.Break() | ast.Continue():
                yield simple("Pass", [], type(stmt).__name__.lower().encode())
            case ast.Match(subject, cases):
                node = self.node("Match", (0,), stmt, [self.expr(subject)])
                clauses = [self.clause(case) for case in cases]
                node.children.append(Node("Block", children=[*clauses]))
                node.end = clauses[-1].end
                yield node
            case ast.Try(body, handlers, orelse, finalbody):
                yield from self.attempt(stmt, body, handlers, orelse, finalbody, 0)
            case _ if type(stmt).__name__ == "TryStar":
                star: Any = stmt
                yield from self.attempt(star, star.body, star.handlers, star.orelse, star.finalbody, EXCEPT_GROUP)
            case _ if type(stmt).__name__ == "TypeAlias":
                alias: Any = stmt
                parameters = [self.type_parameter(parameter) for parameter in alias.type_params]
                yield simple("TypeAlias", [*parameters, self.expr(alias.value)], alias.name.id, 0, len(parameters))
            case _:
                raise NotImplementedError(type(stmt).__name__)

    def attempt(
        self,
        stmt: Any,
        body: list[ast.stmt],
        handlers: list[ast.ExceptHandler],
        orelse: list[ast.stmt],
        finalbody: list[ast.stmt],
        flags: int,
    ) -> Iterator[Node]:
        yield self.head("Try", stmt, [], body)
        for handler in handlers:
            exprs = self.optional(handler.type)
            if handler.name is not None:
                exprs.append(Node("Name", (handler.name, True)))
            yield self.head("Except", handler, exprs, handler.body, flags)
        yield from self.bare("Else", orelse)
        yield from self.bare("Finally", finalbody)

    def clause(self, case: ast.match_case) -> Node:
        node = Node("Case", (0,), None, None, [self.pattern(case.pattern), *self.optional(case.guard)])
        return self.with_block(node, case.body)

    def named(self, stmt: Any, kind: str, flags: int, exprs: Sequence[Node | None], *detail: object) -> Node:
        parameters = [self.type_parameter(parameter) for parameter in getattr(stmt, "type_params", [])]
        decorators = self.all(stmt.decorator_list)
        name = (stmt.name, len(decorators), len(parameters))
        node = self.node(kind, (flags, *name, *detail), stmt, [*decorators, *parameters, *exprs])
        return self.with_block(node, stmt.body)

    def definition(self, stmt: ast.FunctionDef | ast.AsyncFunctionDef) -> Node:
        exprs = self.parameters(stmt.args)
        if stmt.returns is not None:
            exprs.append(Node("Hint", children=[self.expr(stmt.returns)]))
        own = list(own_nodes(stmt))
        has_yield = any(isinstance(node, (ast.Yield, ast.YieldFrom)) for node in own)
        returns = any(isinstance(node, ast.Return) and node.value is not None for node in own)
        flags = ASYNC_STMT if isinstance(stmt, ast.AsyncFunctionDef) else 0
        return self.named(stmt, "Def", flags, exprs, has_yield, returns)

    def path(self, module: str, level: int) -> Node:
        names: list[Node | None] = [Node("Name", (name, False)) for name in module.split(".") if module]
        return Node("ModulePath", (level,), children=names)

    def alias(self, alias: ast.alias, is_path: bool) -> Node:
        if alias.name == "*":
            return self.node("ImportAlias", (True,), alias, [])
        name = self.path(alias.name, 0) if is_path else Node("Name", (alias.name, False))
        behind = [Node("Name", (alias.asname, False))] if alias.asname else []
        return self.node("ImportAlias", (False,), alias, [name, *behind])

    def parameters(self, args: ast.arguments) -> list[Node | None]:
        nodes: list[Node | None] = []

        def add(kind: str, arg: ast.arg, value: ast.expr | None = None) -> None:
            parts = [self.expr(part) if part else None for part in (arg.annotation, value)]
            detail = (kind, arg.arg, self.place(arg.lineno, arg.col_offset))
            nodes.append(Node("Parameter", detail, children=[*parts, None]))

        def mark(kind: str) -> None:
            nodes.append(Node("Parameter", (kind, "", None), children=[None, None, None]))

        plain = args.posonlyargs + args.args
        defaults = [None] * (len(plain) - len(args.defaults)) + args.defaults
        for i, (arg, value) in enumerate(zip(plain, defaults, strict=True)):
            add("plain", arg, value)
            if i + 1 == len(args.posonlyargs):
                mark("/")
        if args.vararg:
            add("*", args.vararg)
        elif args.kwonlyargs:
            mark("bare *")
        for arg, value in zip(args.kwonlyargs, args.kw_defaults, strict=True):
            add("plain", arg, value)
        if args.kwarg:
            add("**", args.kwarg)
        return nodes

    def type_parameter(self, parameter: Any) -> Node:
        kind = {"TypeVar": "plain", "TypeVarTuple": "*", "ParamSpec": "**"}[type(parameter).__name__]
        parts = [getattr(parameter, "bound", None), getattr(parameter, "default_value", None)]
        children = [self.expr(part) if part else None for part in parts]
        return self.node("TypeParameter", (kind, parameter.name), parameter, children)

    # -- expressions --

    def all(self, exprs: Iterable[ast.expr]) -> list[Node | None]:
        return [self.expr(expr) for expr in exprs]

    def optional(self, expr: ast.expr | None) -> list[Node | None]:
        return [] if expr is None else [self.expr(expr)]

    def arguments(self, arguments: list[Any]) -> list[Node | None]:
        def place(argument: Any) -> tuple[int, int]:
            return argument.lineno, argument.col_offset

        return [self.argument(argument) for argument in sorted(arguments, key=place)]

    def argument(self, argument: Any) -> Node:
        if not isinstance(argument, ast.keyword):
            return self.expr(argument)
        value = self.expr(argument.value)
        if argument.arg is None:
            return self.node("DoubleStarred", (), argument, [value])
        return self.node("Keyword", (argument.arg,), argument, [value])

    def clauses(self, generators: list[ast.comprehension]) -> list[Node | None]:
        return [
            Node("ComprehensionFor", (bool(g.is_async),), children=self.all([g.target, g.iter, *g.ifs]))
            for g in generators
        ]

    def fields(self, values: Iterable[ast.expr]) -> Iterator[Node]:
        for value in values:
            if type(value).__name__ in ("FormattedValue", "Interpolation"):
                fields: Any = value
                yield self.expr(fields.value)
                if fields.format_spec is not None:
                    yield from self.fields(fields.format_spec.values)

    def expr(self, expr: ast.expr) -> Node:
        def made(kind: str, children: Sequence[Node | None], *detail: object) -> Node:
            return self.node(kind, detail, expr, children)

        is_target = isinstance(getattr(expr, "ctx", None), (ast.Store, ast.Del))
        match expr:
            case ast.Name(name):
                return made("Name", [], name, is_target)
            case ast.Attribute(value, name):
                return made("Attribute", [self.expr(value)], name, is_target)
            case ast.Subscript(value, index):
                is_tuple = isinstance(index, ast.Tuple)
                items = self.all(index.elts) if isinstance(index, ast.Tuple) else [self.expr(index)]
                return made("Subscript", [self.expr(value), *items], is_target, is_tuple)
            case ast.Slice(lower, upper, step):
                return made("Slice", [self.expr(part) if part else None for part in (lower, upper, step)])
            case ast.Constant(value):
                return self.constant(expr, value)
            case ast.Call(function, args, keywords):
                return made("Call", [self.expr(function), *self.arguments([*args, *keywords])])
            case ast.Starred(value):
                return made("Starred", [self.expr(value)])
            case ast.Tuple(elts) | ast.List(elts) | ast.Set(elts):
                return made(type(expr).__name__, self.all(elts))
            case ast.Dict(keys, values):
                items = []
                for key, value in zip(keys, values, strict=True):
                    if key is None:
                        items += [Node("DoubleStarred", children=[self.expr(value)]), None]
                    else:
                        items += self.all([key, value])
                return made("Dict", items)
            case ast.UnaryOp(op, operand):
                return made("Unary", [self.expr(operand)], type(op).__name__)
            case ast.BinOp(left, op, right):
                return made("Binary", self.all([left, right]), type(op).__name__)
            case ast.BoolOp(op, values):
                return made("Boolean", self.all(values), type(op).__name__)
            case ast.Compare(left, ops, comparators):
                return made("Compare", self.all([left, *comparators]), type(ops[0]).__name__)
            case ast.IfExp(test, body, orelse):
                return made("Conditional", self.all([body, test, orelse]))
            case ast.Lambda(args, body):
                return made("Lambda", [*self.parameters(args), self.expr(body)])
            case ast.ListComp(elt, generators) | ast.SetComp(elt, generators):
                kind = "ListComprehension" if isinstance(expr, ast.ListComp) else "SetComprehension"
                return made(kind, [self.expr(elt), *self.clauses(generators)])
            case ast.GeneratorExp(elt, generators):
                return made("Generator", [self.expr(elt), *self.clauses(generators)])
            case ast.DictComp(key, value, generators):
                return made("DictComprehension", [self.expr(key), self.expr(value), *self.clauses(generators)])
            case ast.Await(value):
                return made("Await", [self.expr(value)])
            case ast.Yield(value):
                return made("Yield", self.optional(value))
            case ast.YieldFrom(value):
                return made("YieldFrom", [self.expr(value)])
            case ast.NamedExpr(target, value):
                return made("Named", self.all([target, value]))
            case _ if type(expr).__name__ in ("JoinedStr", "TemplateStr"):
                had_places = self.has_places
                string = made("String", [], False, True)
                # Before 3.12 nothing in an f-string has a place that can be relied on.
                self.has_places = had_places and VERSION >= (3, 12)
                joined: Any = expr
                string.children = list(self.fields(joined.values))
                self.has_places = had_places
                return string
        raise NotImplementedError(type(expr).__name__)

    def constant(self, expr: ast.expr, value: object) -> Node:
        if isinstance(value, (str, bytes)):
            return self.node("String", (isinstance(value, bytes), False, value), expr, [])
        if value is None or value is ... or isinstance(value, bool):
            return self.node("Constant", ("Ellipsis" if value is ... else str(value),), expr, [])
        return self.node("Number", (type(value).__name__,), expr, [])

    # -- patterns --

    def pattern(self, pattern: ast.pattern) -> Node:
        def made(kind: str, children: Sequence[Node | None], *detail: object) -> Node:
            return self.node(kind, detail, pattern, children)

        def all_of(patterns: Iterable[ast.pattern]) -> list[Node | None]:
            return [self.pattern(each) for each in patterns]

        match pattern:
            case ast.MatchValue(value):
                return made("PatternValue", [self.expr(value)])
            case ast.MatchSingleton(value):
                return made("PatternValue", [made("Constant", [], str(value))])
            case ast.MatchSequence(patterns):
                return made("PatternSequence", all_of(patterns))
            case ast.MatchMapping(keys, patterns, rest):
                children: list[Node | None] = []
                for key, inner in zip(keys, patterns, strict=True):
                    children += [self.expr(key), self.pattern(inner)]
                if rest is not None:
                    children += [Node("PatternStar", (rest,)), None]
                return made("PatternMapping", children)
            case ast.MatchClass(cls, patterns, names, values):
                keywords = [
                    Node("Keyword", (n,), children=[self.pattern(v)]) for n, v in zip(names, values, strict=True)
                ]
                return made("PatternClass", [self.expr(cls), *all_of(patterns), *keywords])
            case ast.MatchStar(name):
                return made("PatternStar", [], name or "")
            case ast.MatchAs(None, name):
                return made("PatternCapture", [], name or "")
            case ast.MatchAs(inner, name):
                assert inner is not None
                return made("PatternAs", [self.pattern(inner), Node("Name", (name, True))])
            case ast.MatchOr(patterns):
                return made("PatternOr", all_of(patterns))
        raise NotImplementedError(type(pattern).__name__)


def own_nodes(function: ast.AST) -> Iterator[ast.AST]:
    """What runs in a function's own frame."""
    stack: list[ast.AST] = list(getattr(function, "body", []))
    while stack:
        node = stack.pop()
        yield node
        if isinstance(node, (ast.FunctionDef, ast.AsyncFunctionDef)):
            stack += [*node.decorator_list, *node.args.defaults, *filter(None, node.args.kw_defaults)]
        elif isinstance(node, ast.ClassDef):
            stack += [*node.decorator_list, *node.bases, *(keyword.value for keyword in node.keywords)]
        elif not isinstance(node, ast.Lambda):
            stack += ast.iter_child_nodes(node)


def node_of_hint(text: str) -> Node | None:
    """What a string says that stands for a type, without places; None for no expression."""
    reference = Reference(b"")
    reference.has_places = False
    try:
        if text.lstrip().startswith("*"):
            said = ast.parse(f"x[{text}]", mode="eval").body
            return reference.expr(said).children[1]
        return reference.expr(ast.parse(text.strip(" \t"), mode="eval").body)
    except SyntaxError:
        return None


def nodes_of(data: bytes, source: bytes) -> list[Node | None] | None:
    """Of a file's bytes, which are `source` in UTF-8; None where they are no code of this Python."""
    try:
        with warnings.catch_warnings():
            warnings.simplefilter("ignore")
            said = ast.parse(data)
    except (SyntaxError, ValueError, UnicodeError):
        return None
    return Reference(source).block(said.body)


def main() -> None:
    """Answers until its input ends."""
    sys.setrecursionlimit(RECURSION_LIMIT)
    while True:
        try:
            data, source = pickle.load(sys.stdin.buffer)
        except EOFError:
            return
        pickle.dump(nodes_of(data, source), sys.stdout.buffer)
        sys.stdout.buffer.flush()
