"""What the host's `ast` says of names, statement by statement, and what quillet means to say instead.

`Expectation` walks a syntax tree and files every fact (a kind and a name) under the physical lines of its
statement. Where quillet means to say something else, the visitor says so there and then, by a `Rule`: a
fact of the tree that is not to be recorded, or a record that the tree has no fact for. So what quillet has
to record is known exactly, and whatever is left over is a mistake of one of the two. docs/agreement.md
describes the rules.

The traps: lines that share a physical line are compared as one group; before 3.12 the nodes inside of
an f-string have positions of their own invention, and the string's stands for them; brackets leave no
trace in the tree, so the source is asked for them.
"""

from __future__ import annotations

import ast
import bisect
import contextlib
import io
import re
import sys
import tokenize
from collections import Counter, defaultdict
from collections.abc import Iterable, Iterator
from enum import Enum
from typing import NamedTuple

from quillet import Line

_COMMENT = re.compile(rb"#[^'\"]*$")
_HINT_PREFIX = re.compile(r"[rRuU]{0,2}['\"]")
_FIELDS_HAVE_POSITIONS = sys.version_info >= (3, 12)


class Kind(str, Enum):
    """The classes of facts that are compared."""

    READ = "names read"
    CHAIN = "dotted names read"
    FSTRING = "names read in f-strings"
    BOUND = "names bound"
    ATTRIBUTE = "attributes bound"
    WITHIN = "names bound inside of expressions"
    IMPORT = "imports"
    GLOBAL = "declared global"
    NONLOCAL = "declared nonlocal"
    CALLED = "calls"
    PARAMETER = "parameters"
    TYPE_PARAMETER = "type parameters"


class Rule(str, Enum):
    """Why quillet means to say something else than the tree."""

    AUGMENTED = "the target of an augmented assignment is read, not bound"
    DELETED = "the operand of del is read"
    ANNOTATION_ONLY = "an annotation without a value binds nothing"
    BRACKETED_TARGET = "a target alone in round brackets is not bound"
    STARRED_GROUP = "a bracketed target behind a star is not taken apart"
    IN_TARGET = "inside of a target, only subscripts and the fronts of chains are read"
    WITH_TARGET = "the target of with is bound and not read"
    BRACKETED_CHAIN = "a chain with brackets in it is no dotted name"
    STRING_HINT = "a string in an annotation is read as a hint"
    COMMENT_HINT = "a type comment is read as a hint"
    LONE_CASE = "a case that is one name or dotted name records nothing"
    DOTTED_PATTERN = "a dotted name inside of a pattern is read name by name"
    CONSTANT_CHAIN = "an attribute of None, True or False is a dotted name"
    LONE_STAR = "a call whose only argument is starred counts as a call"
    DECORATOR = "a decorator is a call"
    ALIAS_PARAMETER = "the parameters of a type statement are not recorded"
    WALK_LIMIT = "a walk limit ends the records of the statement"
    REJECTED = "the statement is rejected on purpose"
    BARE_ELLIPSIS = "a bare `...` as an annotation or match subject leaves the statement without records"


class Fact(NamedTuple):
    """One thing that is said of one name; `count` is the number of arguments of a call."""

    kind: Kind
    name: str
    count: int = 0


class Groups:
    """Logical lines in order, those that share a physical line together."""

    def __init__(self, lines: Iterable[Line]) -> None:
        self.lines: list[list[Line]] = []
        self._starts: list[int] = []
        end = 0
        for line in lines:
            if self.lines and line.first_line <= end:
                self.lines[-1].append(line)
            else:
                self._starts.append(line.first_line)
                self.lines.append([line])
            end = max(end, line.last_line)

    def at(self, line_number: int) -> int:
        """The index of the group that holds a physical line."""
        return max(bisect.bisect_right(self._starts, line_number) - 1, 0)


class Brackets:
    """What stands around a node, blanks, line ends and comments left out."""

    def __init__(self, source_line: list[bytes]) -> None:
        self._lines = source_line

    def before(self, line: int, col: int) -> str:
        """The last byte in front of a place."""
        text = self._lines[line - 1][:col]
        while True:
            text = text.rstrip(b" \t\f\\\r\n")
            if text:
                return chr(text[-1])
            if line == 1:
                return ""
            line -= 1
            text = _without_comment(self._lines[line - 1])

    def after(self, line: int, col: int) -> str:
        """The first byte behind a place."""
        text = self._lines[line - 1][col:]
        while True:
            text = text.lstrip(b" \t\f\\\r\n")
            if text and text[:1] != b"#":
                return chr(text[0])
            if line >= len(self._lines):
                return ""
            line += 1
            text = self._lines[line - 1]

    def between(self, start: tuple[int, int], end: tuple[int, int]) -> str:
        """The text between two places, without comments."""
        if start[0] == end[0]:
            return self._lines[start[0] - 1][start[1] : end[1]].decode("utf-8", "replace")
        rows = [self._lines[start[0] - 1][start[1] :], *self._lines[start[0] : end[0] - 1]]
        rows = [_without_comment(row) for row in rows]
        rows.append(self._lines[end[0] - 1][: end[1]])
        return b"\n".join(rows).decode("utf-8", "replace")

    def alone(self, node: ast.expr | ast.pattern) -> bool:
        """Whether round brackets hold this node and nothing else."""
        end_line, end_col = _end(node)
        return self.before(node.lineno, node.col_offset) == "(" and self.after(end_line, end_col) == ")"


def _without_comment(row: bytes) -> bytes:
    # A quote tells a comment from a string with the sign in it well enough.
    return _COMMENT.sub(b"", row)


def _end(node: ast.expr | ast.pattern) -> tuple[int, int]:
    assert node.end_lineno is not None
    assert node.end_col_offset is not None
    return node.end_lineno, node.end_col_offset


class Expectation(ast.NodeVisitor):
    """The facts of a tree, by group.

    `said` is what both say, `dropped` what only the tree says and `added` what only quillet does, each
    by a rule. `ellipses` counts the places where a bare `...` ends the records of a statement.
    """

    def __init__(self, tree: ast.AST, groups: Groups, source: list[bytes]) -> None:
        self.said: dict[int, set[Fact]] = defaultdict(set)
        self.dropped: dict[int, dict[Fact, Rule]] = defaultdict(dict)
        self.added: dict[int, dict[Fact, Rule]] = defaultdict(dict)
        self.ellipses: Counter[int] = Counter()
        self._groups = groups
        self._brackets = Brackets(source)
        self._line: int | None = None  # stands for the positions of what is being visited
        self._fstring = False
        self._followed = False  # a trailer follows the node that is visited next
        self._in_target = False  # where names are not read
        self._in_inner_target = False  # of a comprehension
        self._silent: Rule | None = None  # nothing that is visited is recorded
        self._only_ours: Rule | None = None  # all that is visited is no part of the tree
        self.visit(tree)

    # ---- filing ----

    def _group(self, node: ast.AST) -> int:
        return self._groups.at(self._line if self._line is not None else node.lineno)  # type: ignore[attr-defined]

    def _say(self, kind: Kind, name: str, node: ast.AST, count: int = 0) -> None:
        fact = Fact(kind, name, count)
        if self._silent is not None:
            self.dropped[self._group(node)].setdefault(fact, self._silent)
        elif self._only_ours is not None:
            self.added[self._group(node)].setdefault(fact, self._only_ours)
        else:
            self.said[self._group(node)].add(fact)
            if self._fstring and kind is Kind.READ:
                self.said[self._group(node)].add(Fact(Kind.FSTRING, name))

    def _drop(self, kind: Kind, name: str, node: ast.AST, rule: Rule, count: int = 0) -> None:
        if self._only_ours is None:
            self.dropped[self._group(node)].setdefault(Fact(kind, name, count), self._silent or rule)

    def _add(self, kind: Kind, name: str, node: ast.AST, rule: Rule, count: int = 0) -> None:
        if self._silent is None:
            self.added[self._group(node)].setdefault(Fact(kind, name, count), rule)

    # ---- visiting ----

    def visit(self, node: ast.AST, followed: bool = False) -> None:
        self._followed = followed
        super().visit(node)

    def _visit_all(self, nodes: Iterable[ast.AST | None]) -> None:
        for node in nodes:
            if node is not None:
                self.visit(node)

    @contextlib.contextmanager
    def _within(self, **state: object) -> Iterator[None]:
        before = {name: getattr(self, name) for name in state}
        self.__dict__.update(state)
        try:
            yield
        finally:
            self.__dict__.update(before)

    def _trusts(self) -> bool:
        """Whether positions are those of the source."""
        return self._line is None

    def _alone(self, node: ast.expr | ast.pattern) -> bool:
        return self._trusts() and self._brackets.alone(node)

    def _bracketed_before_trailer(self, value: ast.expr) -> bool:
        return self._trusts() and self._brackets.after(*_end(value)) == ")" and self._alone(value)

    # ---- names and chains ----

    def _read(self, kind: Kind, name: str, node: ast.AST, followed: bool) -> None:
        if not self._in_target or followed:
            self._say(kind, name, node)
            return
        self._drop(kind, name, node, Rule.IN_TARGET)
        if self._in_inner_target:
            self._add(Kind.WITHIN, name, node, Rule.IN_TARGET)

    def visit_Name(self, node: ast.Name) -> None:
        if isinstance(node.ctx, ast.Load):
            self._read(Kind.READ, node.id, node, self._followed)
        elif isinstance(node.ctx, ast.Del):
            self._add(Kind.READ, node.id, node, Rule.DELETED)

    def _chain(self, node: ast.expr, constants: bool = False) -> str | None:
        """The dotted name that a chain of attributes is, brackets in it or not."""
        names = []
        while isinstance(node, ast.Attribute):
            names.append(node.attr)
            node = node.value
        if isinstance(node, ast.Name):
            names.append(node.id)
        elif constants and isinstance(node, ast.Constant) and (node.value is None or isinstance(node.value, bool)):
            names.append(str(node.value))
        else:
            return None
        return ".".join(reversed(names))

    def _has_inner_brackets(self, node: ast.expr) -> bool:
        while isinstance(node, ast.Attribute):
            if self._bracketed_before_trailer(node.value):
                return True
            node = node.value
        return False

    def visit_Attribute(self, node: ast.Attribute) -> None:
        followed = self._followed
        chain = self._chain(node)
        if chain is not None:
            if isinstance(node.ctx, ast.Load):
                if self._has_inner_brackets(node):
                    self._drop(Kind.CHAIN, chain, node, Rule.BRACKETED_CHAIN)
                else:
                    self._read(Kind.CHAIN, chain, node, followed)
            elif isinstance(node.ctx, ast.Del) and not self._has_inner_brackets(node):
                self._add(Kind.CHAIN, chain, node, Rule.DELETED)
        elif not self._in_target and not self._has_inner_brackets(node):
            chain = self._chain(node, constants=True)
            if chain is not None:
                self._add(Kind.CHAIN, chain, node, Rule.CONSTANT_CHAIN)
        self.visit(node.value, followed=not self._bracketed_before_trailer(node.value))

    def visit_Subscript(self, node: ast.Subscript) -> None:
        self.visit(node.value, followed=not self._bracketed_before_trailer(node.value))
        with self._within(_in_target=False):
            self.visit(node.slice)

    # ---- calls ----

    def _called(self, node: ast.Call, rule: Rule | None = None) -> None:
        callee = self._chain(node.func)
        if callee is None:
            return
        starred = [argument for argument in node.args if isinstance(argument, ast.Starred)]
        unpacked = [keyword for keyword in node.keywords if keyword.arg is None]
        if len(node.args) + len(node.keywords) == 1 and (starred or unpacked):
            last = starred[0] if starred else unpacked[0].value
            if not (self._trusts() and self._brackets.after(*_end(last)) == ","):
                self._add(Kind.CALLED, callee, node, Rule.LONE_STAR, 1)
        elif node.args and not starred and not node.keywords:
            if self._has_inner_brackets(node.func):
                self._drop(Kind.CALLED, callee, node, Rule.BRACKETED_CHAIN, len(node.args))
            else:
                self._say(Kind.CALLED, callee, node, len(node.args))
        elif not node.args and not node.keywords and rule is not None:
            self._add(Kind.CALLED, callee, node, rule, 0)

    def visit_Call(self, node: ast.Call) -> None:
        self._called(node)
        self.visit(node.func, followed=not self._bracketed_before_trailer(node.func))
        arguments: list[ast.expr] = [*node.args, *(keyword.value for keyword in node.keywords)]
        self._visit_all(arguments)
        is_cast = self._chain(node.func) in ("cast", "typing.cast")
        if is_cast and node.args and not self._fstring and self._only_ours is None:
            self._string_hints(node.args[0])

    def _decorators(self, decorators: list[ast.expr]) -> None:
        for decorator in decorators:
            callee = decorator.func if isinstance(decorator, ast.Call) else decorator
            chain = self._chain(callee)
            if isinstance(decorator, ast.Call):
                self._called(decorator, Rule.DECORATOR)
                self.visit(callee, followed=True)
                self._visit_all([*decorator.args, *(keyword.value for keyword in decorator.keywords)])
            else:
                if chain is not None:
                    self._add(Kind.CALLED, chain, decorator, Rule.DECORATOR, 0)
                self.visit(decorator)

    # ---- targets ----

    def _bind(self, target: ast.expr, rule: Rule | None = None) -> None:
        """Files what a target binds; with a rule, what it would bind."""
        if isinstance(target, (ast.Tuple, ast.List)):
            for element in target.elts:
                self._bind(element, rule)
        elif isinstance(target, ast.Starred):
            self._bind(target.value, Rule.STARRED_GROUP if isinstance(target.value, (ast.Tuple, ast.List)) else rule)
        else:
            chain = self._chain(target)
            if chain is None:
                return
            kind = Kind.BOUND if isinstance(target, ast.Name) else Kind.ATTRIBUTE
            if rule is None and self._alone(target):
                rule = Rule.BRACKETED_TARGET
            if rule is None and self._has_inner_brackets(target):
                rule = Rule.BRACKETED_CHAIN
            if rule is None:
                self._say(kind, chain, target)
            else:
                self._drop(kind, chain, target, rule)

    def _read_target(self, target: ast.expr) -> None:
        with self._within(_in_target=True, _in_inner_target=False):
            self.visit(target)

    def visit_Assign(self, node: ast.Assign) -> None:
        for target in node.targets:
            self._bind(target)
            self._read_target(target)
        self.visit(node.value)

    def visit_AugAssign(self, node: ast.AugAssign) -> None:
        target = node.target
        chain = self._chain(target)
        if chain is not None:
            self._bind(target, Rule.AUGMENTED)
            if not self._has_inner_brackets(target):
                kind = Kind.READ if isinstance(target, ast.Name) else Kind.CHAIN
                self._add(kind, chain, target, Rule.AUGMENTED)
        self.visit(target)
        self.visit(node.value)

    def visit_AnnAssign(self, node: ast.AnnAssign) -> None:
        self._bind(node.target, Rule.ANNOTATION_ONLY if node.value is None else None)
        self._read_target(node.target)
        self._annotation(node.annotation)
        if node.value is not None:
            self.visit(node.value)

    def visit_For(self, node: ast.For | ast.AsyncFor) -> None:
        self._bind(node.target)
        self._read_target(node.target)
        self._visit_all([node.iter, *node.body, *node.orelse])

    visit_AsyncFor = visit_For

    def visit_withitem(self, node: ast.withitem) -> None:
        self.visit(node.context_expr)
        if node.optional_vars is not None:
            self._bind(node.optional_vars)
            with self._within(_silent=self._silent or Rule.WITH_TARGET):
                self.visit(node.optional_vars)

    def visit_NamedExpr(self, node: ast.NamedExpr) -> None:
        self._bind(node.target)
        self.visit(node.value)

    def visit_ExceptHandler(self, node: ast.ExceptHandler) -> None:
        if node.name is not None:
            self._say(Kind.BOUND, node.name, node)
        self._visit_all([node.type, *node.body])

    # ---- expressions with a scope of their own ----

    def visit_comprehension(self, node: ast.comprehension) -> None:
        for inner in ast.walk(node.target):
            if isinstance(getattr(inner, "ctx", None), ast.Store):
                chain = self._chain(inner)  # type: ignore[arg-type]
                if chain is not None:
                    self._say(Kind.WITHIN, chain, inner)
        with self._within(_in_target=True, _in_inner_target=True):
            self.visit(node.target)
        self._visit_all([node.iter, *node.ifs])

    def visit_Lambda(self, node: ast.Lambda) -> None:
        for argument in _arguments(node.args):
            self._say(Kind.WITHIN, argument.arg, argument)
        self._visit_all([*node.args.defaults, *node.args.kw_defaults, node.body])

    def visit_JoinedStr(self, node: ast.JoinedStr) -> None:
        line = self._line
        if not _FIELDS_HAVE_POSITIONS and line is None:
            line = node.lineno
        with self._within(_line=line, _fstring=True):
            self.generic_visit(node)

    # ---- definitions and declarations ----

    def visit_FunctionDef(self, node: ast.FunctionDef | ast.AsyncFunctionDef) -> None:
        self._decorators(node.decorator_list)
        self._say(Kind.BOUND, node.name, node)
        self._type_parameters(node, True)
        for argument in _arguments(node.args):
            self._say(Kind.PARAMETER, argument.arg, argument)
            if argument.annotation is not None:
                self._annotation(argument.annotation)
        self._visit_all([*node.args.defaults, *node.args.kw_defaults])
        if node.returns is not None:
            self._annotation(node.returns)
        self._visit_all(node.body)

    visit_AsyncFunctionDef = visit_FunctionDef

    def visit_ClassDef(self, node: ast.ClassDef) -> None:
        self._decorators(node.decorator_list)
        self._say(Kind.BOUND, node.name, node)
        self._type_parameters(node, True)
        self._visit_all([*node.bases, *(keyword.value for keyword in node.keywords), *node.body])

    def visit_TypeAlias(self, node: ast.AST) -> None:
        self._bind(node.name)  # type: ignore[attr-defined]
        self._type_parameters(node, False)
        self.visit(node.value)  # type: ignore[attr-defined]

    def _type_parameters(self, node: ast.AST, recorded: bool) -> None:
        for parameter in getattr(node, "type_params", ()):
            if recorded:
                self._say(Kind.TYPE_PARAMETER, parameter.name, parameter)
            else:
                self._drop(Kind.TYPE_PARAMETER, parameter.name, parameter, Rule.ALIAS_PARAMETER)
            if getattr(parameter, "default_value", None) is not None:
                self.visit(parameter.default_value)
            if getattr(parameter, "bound", None) is not None:
                self.visit(parameter.bound)

    def visit_Import(self, node: ast.Import) -> None:
        for alias in node.names:
            if alias.asname is None:
                name = module = alias.name.split(".")[0]
            else:
                name, module = alias.asname, alias.name
                self._say(Kind.IMPORT, f"{name}: as {name}", alias)
            self._say(Kind.BOUND, name, alias)
            self._say(Kind.IMPORT, f"{name}: import {module}", alias)

    def visit_ImportFrom(self, node: ast.ImportFrom) -> None:
        module = "." * node.level + (node.module or "")
        for alias in node.names:
            name = alias.asname or alias.name
            self._say(Kind.IMPORT, f"{name}: from {module} {alias.name}", alias)
            if alias.name != "*":
                self._say(Kind.BOUND, name, alias)
            if alias.asname is not None:
                self._say(Kind.IMPORT, f"{name}: as {name}", alias)

    def visit_Global(self, node: ast.Global) -> None:
        for name in node.names:
            self._say(Kind.GLOBAL, name, node)

    def visit_Nonlocal(self, node: ast.Nonlocal) -> None:
        for name in node.names:
            self._say(Kind.NONLOCAL, name, node)

    # ---- hints ----

    def _check_ellipsis(self, node: ast.expr) -> None:
        if isinstance(node, ast.Constant) and node.value is ... and not self._alone(node):
            self.ellipses[self._group(node)] += 1

    def _annotation(self, node: ast.expr) -> None:
        self._check_ellipsis(node)
        self.visit(node)
        self._string_hints(node)

    def _string_hints(self, node: ast.expr) -> None:
        """Adds what the strings that stand for a whole type say."""
        if isinstance(node, ast.Constant) and isinstance(node.value, str):
            self._string_hint(node)
        elif isinstance(node, ast.Starred):
            self._string_hints(node.value)
        elif isinstance(node, (ast.Tuple, ast.List)):
            for element in node.elts:
                self._string_hints(element)
        elif isinstance(node, ast.BinOp) and isinstance(node.op, ast.BitOr):
            self._string_hints(node.left)
            self._string_hints(node.right)
        elif isinstance(node, ast.Subscript):
            name = (self._chain(node.value) or "").rpartition(".")[2]
            if name == "Annotated" and isinstance(node.slice, ast.Tuple):
                self._string_hints(node.slice.elts[0])
            elif name != "Literal":
                self._string_hints(node.slice)

    def _string_hint(self, node: ast.Constant) -> None:
        text = self._brackets.between((node.lineno, node.col_offset), _end(node))
        if not _HINT_PREFIX.match(text) or "\\" in text or not _is_one_string(text):
            return
        hint = expression_of(node.value)
        if hint is None:
            return
        with self._within(_line=node.lineno, _only_ours=Rule.STRING_HINT):
            self.visit(hint)

    # ---- patterns ----

    def visit_Match(self, node: ast.Match) -> None:
        self._check_ellipsis(node.subject)
        self.visit(node.subject)
        for case in node.cases:
            self._pattern(case.pattern, top=True)
            self._visit_all([case.guard, *case.body])

    def _value_in_pattern(self, value: ast.expr, top: bool = False) -> None:
        if not isinstance(value, (ast.Name, ast.Attribute)):
            return  # a literal
        if top:
            with self._within(_silent=self._silent or Rule.LONE_CASE):
                self.visit(value)
            return
        while isinstance(value, ast.Attribute):
            self._add(Kind.READ, value.attr, value, Rule.DOTTED_PATTERN)
            self._drop(Kind.CHAIN, self._chain(value) or "", value, Rule.DOTTED_PATTERN)
            value = value.value
        self.visit(value)

    def _pattern(self, pattern: ast.pattern, top: bool = False) -> None:
        if isinstance(pattern, ast.MatchValue):
            self._value_in_pattern(pattern.value, top)
        elif isinstance(pattern, (ast.MatchSequence, ast.MatchOr)):
            for inner in pattern.patterns:
                self._pattern(inner)
        elif isinstance(pattern, ast.MatchStar):
            if pattern.name is not None:
                self._say(Kind.BOUND, pattern.name, pattern)
        elif isinstance(pattern, ast.MatchMapping):
            for key in pattern.keys:
                self._value_in_pattern(key)
            for inner in pattern.patterns:
                self._pattern(inner)
            if pattern.rest is not None:
                self._say(Kind.BOUND, pattern.rest, pattern)
        elif isinstance(pattern, ast.MatchClass):
            self._value_in_pattern(pattern.cls)
            for inner in [*pattern.patterns, *pattern.kwd_patterns]:
                self._pattern(inner)
        elif isinstance(pattern, ast.MatchAs):
            if pattern.pattern is not None:
                self._pattern(pattern.pattern)
            if pattern.name is not None and pattern.pattern is None and top:
                self._drop(Kind.BOUND, pattern.name, pattern, Rule.LONE_CASE)
            elif pattern.name is not None:
                self._say(Kind.BOUND, pattern.name, pattern)


def _arguments(arguments: ast.arguments) -> list[ast.arg]:
    stars = [argument for argument in (arguments.vararg, arguments.kwarg) if argument is not None]
    return [*arguments.posonlyargs, *arguments.args, *arguments.kwonlyargs, *stars]


def expression_of(text: str) -> ast.expr | None:
    """The expression of a hint's text. A starred type is none by itself, but stands in a row of types."""
    for end in (")", ",)") if text.strip() else ():
        with contextlib.suppress(SyntaxError, ValueError):
            return ast.parse(f"(\n{text}\n{end}", mode="eval").body
    return None


def _is_one_string(text: str) -> bool:
    tokens = tokenize.generate_tokens(io.StringIO(f"({text}\n)").readline)
    return sum(token.type == tokenize.STRING for token in tokens) == 1
