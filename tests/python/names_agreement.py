"""quillet's names beside `symtable` and `ast` of every Python that is found here, and a count of everything.

Each library, tests included, is read by its own interpreter (see names_oracle.py) and bound as its version. Run as a
command it compares them all and prints the table of docs/names-agreement.md; the exit code is 1 where a difference is
left that no rule explains:

    python tests/python/names_agreement.py                  every library
    python tests/python/names_agreement.py --write          and puts the table into docs/names-agreement.md
    python tests/python/names_agreement.py --python 3.12    only of this version (may be repeated)
    python tests/python/names_agreement.py --python 3.12 FILE OR FOLDER...
"""

from __future__ import annotations

import argparse
import ast
import json
import re
import subprocess
import sys
import threading
import unicodedata
from collections import Counter
from collections.abc import Iterator, Sequence
from dataclasses import dataclass, field
from enum import Enum
from pathlib import Path
from typing import Any

if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parent.parent.parent / "scripts"))

from names_oracle import names_of_text, strings_of_type
from quillet import FileBindings, Occurrence, Symbol, bind
from quillet._source import to_utf8
from survey import NOT_THE_LIBRARY, Library, libraries

ORACLE = Path(__file__).resolve().parent / "names_oracle.py"
DOCUMENT = Path(__file__).resolve().parent.parent.parent / "docs" / "names-agreement.md"
TABLE = re.compile(r"(?<=<!-- counts -->\n).*?(?=<!-- end of counts -->)", re.DOTALL)
VERSIONS = ((2, 7), (3, 8), (3, 9), (3, 10), (3, 11), (3, 12), (3, 13))
QUESTIONS = (
    "is_parameter", "is_global", "is_declared_global", "is_nonlocal", "is_local", "is_free", "is_imported",
    "is_assigned", "is_referenced", "is_annotated", "is_namespace",
)  # fmt: skip


class Rule(Enum):
    """What a difference may follow from. The values are the headings of the document."""

    MADE_UP = "a name that no source spells is no symbol"
    INLINED = "a comprehension that 3.12 inlines keeps its scope"
    SCOPE_NAME = "a name is no namespace because something nested is called so"
    DECORATED_LINE = "in 2.7 a decorated definition begins with its decorators"
    COMPREHENSION_LINE = "in 2.7 a comprehension has no line"
    FIELD_LINE = "before 3.12 what stands in an f-string has no line of its own"
    NO_STEP = "in 2.7 `a[::]` reads None"
    ESCAPES = "a string with escapes holds no annotation"
    TOP = "a function called top is not the module"


def answers_of(symbol: Symbol) -> int:
    """The answers of a symbol, a bit a question."""
    return sum(1 << bit for bit, question in enumerate(QUESTIONS) if getattr(symbol, question)())


def words_of(answers: int) -> str:
    return " ".join(question[3:] for bit, question in enumerate(QUESTIONS) if answers >> bit & 1) or "nothing"


# ---- the counts ----


@dataclass
class Tally:
    """The count of one kind of things that are compared."""

    compared: int = 0
    left: int = 0


@dataclass
class Report:
    """The comparison of one library. `left` are the differences that no rule explains: what, and an example."""

    name: str
    files: int = 0
    refused: int = 0
    tallies: dict[str, Tally] = field(default_factory=dict)
    by_rule: Counter[Rule] = field(default_factory=Counter)
    left: dict[str, list[str]] = field(default_factory=dict)
    counts: Counter[str] = field(default_factory=Counter)

    def count(self, what: str, number: int = 1) -> None:
        self.tallies.setdefault(what, Tally()).compared += number

    def differ(self, what: str, kind: str, example: str) -> None:
        """Adds a difference; those of one kind are alike."""
        self.tallies.setdefault(what, Tally()).left += 1
        self.left.setdefault(f"{what}: {kind}", []).append(example)

    @property
    def left_over(self) -> int:
        return sum(tally.left for tally in self.tallies.values())


# ---- symtable ----


@dataclass
class Table:
    """A scope in the form of `symtable`: symbols with their answers, and what is nested in it."""

    kind: str
    name: str
    line: int
    symbols: dict[str, int]
    children: list[Table]
    column: int = 1
    scope: int = -1  # of quillet
    is_generator: bool = False

    def key(self) -> tuple[str, str, int]:
        return self.kind, self.name, self.line


_KINDS = {
    "type parameter": "type parameters",
    "type parameters": "type parameters",
    "TypeVar bound": "annotation",
    "type variable": "annotation",
    "type alias": "annotation",
}
_FUNCTIONS = {"lambda": "lambda", "listcomp": "comprehension", "setcomp": "comprehension", "dictcomp": "comprehension",
              "genexpr": "comprehension"}  # fmt: skip


def table_of_symtable(said: list[Any]) -> Table:
    """What `symtable` said, with the words of quillet for kinds and names."""
    kind, name, line, symbols, children = said
    if kind == "module":
        name, line = "", 1
    elif kind == "function" and name in _FUNCTIONS and (name == "lambda" or ".0" in symbols):
        kind, name = _FUNCTIONS[name], ""
    return Table(_KINDS.get(kind, kind), name, line, dict(symbols), [table_of_symtable(child) for child in children])


def table_of_bindings(bindings: FileBindings, source: bytes) -> Table:
    """The listed scopes of quillet as a tree."""
    rows = source.split(b"\n")
    tables: list[Table | None] = []
    for index, scope in enumerate(bindings.scopes):
        if not scope.is_listed:
            tables.append(None)
            continue
        symbols = {symbol.name: answers_of(symbol) for symbol in scope.symbols}
        table = Table(scope.kind, scope.name, scope.first_line, symbols, [], scope.column, index)
        if scope.kind == "comprehension":
            row = (
                rows[scope.first_line - 1].lstrip(b"\xef\xbb\xbf")
                if scope.first_line == 1
                else rows[scope.first_line - 1]
            )
            table.is_generator = row[scope.column - 1 : scope.column] not in (b"[", b"{")
        if scope.parent is not None:
            around = tables[scope.parent]
            assert around is not None, "a scope that is listed stands in one that is not"
            around.children.append(table)
        tables.append(table)
    assert tables[0] is not None
    return tables[0]


_BIT = {question: 1 << bit for bit, question in enumerate(QUESTIONS)}
# What symtable lists and no source spells. The last three are names that a class is given.
_MADE_UP = {"__classdict__", "__type_params__", "__static_attributes__", "__classdictcell__"}


class TableComparison:
    """The symbol table of one file."""

    def __init__(self, report: Report, path: str, version: tuple[int, int], said: dict[str, Any]) -> None:
        self._report = report
        self._path = path
        self._version = version
        self._said = said
        self._rows: list[bytes] = said["rows"]
        self._found: list[tuple[str, str, str]] = []
        self._rules: Counter[Rule] = Counter()
        self._scopes = 0
        self._symbols = 0

    def run(self, theirs: Table, ours: Table) -> None:
        if self._version >= (3, 12):
            self._inline(ours, in_class_annotations=False)
        if self._version == (2, 7):
            self._set_lines_of_2_7(theirs)
        self._compare(theirs, ours)
        self._report.count("scopes", self._scopes)
        self._report.count("symbols", self._symbols)
        self._report.count("questions", self._symbols * len(QUESTIONS))
        self._report.by_rule += self._rules
        for what, kind, example in self._found:
            self._report.differ(what, kind, f"{self._path}:{example}")

    # -- rules that change a table before it is compared --

    def _inline(self, table: Table, in_class_annotations: bool) -> None:
        """3.12 and 3.13 put a comprehension that is no generator into the scope around it, but for those in the
        annotation scopes of a class.
        """
        children: list[Table] = []
        for child in table.children:
            sees_class = child.kind in ("annotation", "type parameters") and (
                table.kind == "class" or (in_class_annotations and table.kind in ("annotation", "type parameters"))
            )
            self._inline(child, sees_class)
            if child.kind != "comprehension" or child.is_generator or in_class_annotations:
                children.append(child)
                continue
            self._rules[Rule.INLINED] += 1
            children += child.children
            for name, answers in child.symbols.items():
                # A name that the scope only hands on to what is nested in it is in no table yet.
                if table.symbols.get(name, _BIT["is_free"]) == _BIT["is_free"]:
                    if table.kind == "class" and name == "__class__" and answers & _BIT["is_free"]:
                        answers = answers & ~_BIT["is_free"] | _BIT["is_global"]
                    bound = _BIT["is_local"]
                    if table.kind == "module" and answers & bound:
                        answers |= _BIT["is_global"]
                    table.symbols[name] = answers
        table.children = children

    def _set_lines_of_2_7(self, table: Table) -> None:
        """2.7 gives the first decorator's line for what is decorated."""
        for child in table.children:
            if child.kind in ("class", "function") and self._rows[child.line - 1].lstrip().startswith(b"@"):
                word = (b"class", b"def")[child.kind == "function"]
                name = child.name.encode()
                line = child.line
                while line <= len(self._rows):
                    words = self._rows[line - 1].replace(b"(", b" ").replace(b":", b" ").split()
                    if words[:2] == [word, name]:
                        self._rules[Rule.DECORATED_LINE] += 1
                        child.line = line
                        break
                    line += 1
            self._set_lines_of_2_7(child)

    def _set_lines_in_fields(self, theirs: Table, ours: Table) -> None:
        """Before 3.12 a scope in an f-string of several lines is on any of them."""
        keys = Counter(child.key() for child in ours.children)
        keys.subtract(child.key() for child in theirs.children)
        for child in theirs.children:
            if keys[child.key()] >= 0 or child.kind not in ("comprehension", "lambda"):
                continue
            for first, last in self._said["spread"]:
                lines = [line for line in range(first, last + 1) if keys[child.kind, child.name, line] > 0]
                if first <= child.line <= last and lines:
                    keys[child.key()] += 1
                    child.line = lines[0]
                    keys[child.key()] -= 1
                    self._rules[Rule.FIELD_LINE] += 1
                    break

    # -- the comparison --

    def _compare(self, theirs: Table, ours: Table) -> None:
        self._scopes += 1
        self._compare_symbols(theirs, ours)
        if self._version == (2, 7):
            # Comprehensions have no line there, and so are told apart by their order.
            lines = [child.line for child in ours.children if child.kind == "comprehension"]
            comprehensions = [child for child in theirs.children if child.kind == "comprehension"]
            for child, line in zip(comprehensions, lines, strict=False):
                if child.line == 0:
                    self._rules[Rule.COMPREHENSION_LINE] += 1
                    child.line = line
        if self._version < (3, 12):
            self._set_lines_in_fields(theirs, ours)
        groups: dict[tuple[str, str, int], tuple[list[Table], list[Table]]] = {}
        for child in theirs.children:
            groups.setdefault(child.key(), ([], []))[0].append(child)
        for child in ours.children:
            groups.setdefault(child.key(), ([], []))[1].append(child)
        for key, (their_group, our_group) in groups.items():
            if len(their_group) != len(our_group):
                kind, name, line = key
                what = "missing" if len(their_group) > len(our_group) else "too many"
                self._found.append(("scopes", f"{kind} {what} in {theirs.kind}", f"{line}: {kind} {name}"))
            for their_child, our_child in self._pairs(their_group, our_group):
                self._compare(their_child, our_child)

    def _pairs(self, theirs: list[Table], ours: list[Table]) -> Iterator[tuple[Table, Table]]:
        """Scopes of one kind, name and line: those that agree, the others in their order. `symtable` visits
        scopes of one line in an order of its own (defaults in front of annotations, keys in front of values).
        """
        if len(theirs) == len(ours) == 1:
            yield theirs[0], ours[0]
            return
        rest = list(ours)
        unlike = []
        for table in theirs:
            for candidate in rest:
                trial = TableComparison(Report(""), "", self._version, self._said)
                trial._compare(table, candidate)
                if not trial._found:
                    rest.remove(candidate)
                    yield table, candidate
                    break
            else:
                unlike.append(table)
        yield from zip(unlike, rest, strict=False)

    def _compare_symbols(self, theirs: Table, ours: Table) -> None:
        for name, answers in theirs.symbols.items():
            if name not in ours.symbols:
                if not all(part.isidentifier() for part in (name,)) or name in _MADE_UP:
                    self._rules[Rule.MADE_UP] += 1
                    continue
                self._symbols += 1
                if name == "None" and self._reads_no_step(theirs):
                    self._rules[Rule.NO_STEP] += 1
                    continue
                self._differ("symbols", f"missing in {theirs.kind}, is {words_of(answers)}", theirs, name, "")
                continue
            self._symbols += 1
            if answers != ours.symbols[name]:
                self._compare_answers(theirs, ours, name, answers, ours.symbols[name])
        for name, answers in ours.symbols.items():
            if name not in theirs.symbols:
                self._differ("symbols", f"too many in {theirs.kind}, is {words_of(answers)}", theirs, name, "")

    def _reads_no_step(self, table: Table) -> bool:
        """Whether a slice without a step stands in a scope of 2.7, or in one that is nested in it."""
        scopes = [self._said["scopes"][scope] for scope in self._said["unwritten"]]
        return any((scope[0], scope[1], scope[3]) == (table.kind, table.name, table.line) for scope in scopes)

    def _compare_answers(self, theirs: Table, ours: Table, name: str, expected: int, got: int) -> None:
        namespace = _BIT["is_namespace"]
        if expected ^ got == namespace:
            # `symtable` asks what is nested in the scope for its name alone.
            nested = {child.name for child in theirs.children} | {*_FUNCTIONS}
            bound = _BIT["is_assigned"] | _BIT["is_parameter"] | _BIT["is_imported"]
            if expected & namespace and name in nested and (name in _FUNCTIONS or not expected & bound):
                self._rules[Rule.SCOPE_NAME] += 1
                return
        if theirs.kind == "function" and theirs.name == "top" and self._version >= (3, 0):
            # What is bound in the module is both local and global.
            bound = any(expected & _BIT[bit] for bit in ("is_assigned", "is_imported", "is_parameter"))
            if bound and got | _BIT["is_global"] | _BIT["is_local"] == expected:
                self._rules[Rule.TOP] += 1
                return
        more, less = words_of(got & ~expected), words_of(expected & ~got)
        self._differ("questions", f"{theirs.kind}: should be {less}, not {more}", theirs, name, words_of(expected))

    def _differ(self, what: str, kind: str, table: Table, name: str, more: str) -> None:
        self._found.append((what, kind, f"{table.line}: {table.kind} {table.name}: {name} {more}"))


# ---- ast ----


def expected_of(what: str, marks: str) -> tuple[str, str | None, frozenset[str], bool]:
    """The role, kind, flags and attribute-ness that follow from a node."""
    flags = {"d": "decorator", "b": "base", "a": "annotation", "u": "augmented"}
    found = frozenset(word for mark, word in flags.items() if mark in marks)
    is_attribute = what == "Attribute"
    if what in ("Name", "Attribute"):
        if "p" in marks:
            return "definition", "parameter", found, False
        if "x" in marks:
            return "delete", None, found, is_attribute
        if "w" in marks:
            role = "definition" if "n" in marks else "write"
            return role, None if is_attribute else "variable", found, is_attribute
        return "call" if "c" in marks else "read", None, found, is_attribute
    if what in ("arg", "vararg", "kwarg"):
        return "definition", "parameter", found, False
    if what in ("keyword", "kwd_attr"):
        return "keyword", None, found, False
    if what in ("FunctionDef", "AsyncFunctionDef"):
        return "definition", "function", found, False
    if what == "ClassDef":
        return "definition", "class", found, False
    if what in ("ExceptHandler", "MatchAs", "MatchStar", "MatchMapping"):
        return "write", "variable", found, False
    if what in ("TypeVar", "ParamSpec", "TypeVarTuple"):
        return "definition", "type_parameter", found, False
    if what == "TypeAlias":
        return "definition", "type_alias", found, False
    if what in ("Global", "Nonlocal"):
        return "declaration", None, found, False
    if what == "asname":
        return "definition", "import", found, False
    if what in ("alias", "from alias"):
        return "import", "import" if "w" in marks else None, found, False
    if what == "module":
        return "import", None, found, False
    raise ValueError(what)


class NamesComparison:
    """The names of one file."""

    def __init__(
        self, report: Report, path: str, version: tuple[int, int], said: dict[str, Any], bindings: FileBindings
    ) -> None:
        self._report = report
        self._path = path
        self._version = version
        self._said = said
        self._bindings = bindings
        self._all = list(bindings.occurrences)
        self._scopes = bindings.scopes

    def run(self) -> None:
        self._ours = [
            (index, occurrence)
            for index, occurrence in enumerate(self._all)
            if not occurrence.flags & {"comment", "string"}
        ]
        self._report.count("names", len(self._said["names"]))
        pairs = self._pairs()
        self._compare_pairs(pairs)
        self._compare_scopes()
        self._compare_variables()
        self._compare_strings()

    def _differ(self, what: str, kind: str, line: int, column: int, text: str) -> None:
        self._report.differ(what, kind, f"{self._path}:{line}:{column}: {text}")

    def _pairs(self) -> list[tuple[int, int]]:
        """Names that stand in the same place, as indices in what `ast` said and in all occurrences."""
        pairs = []
        theirs = self._said["names"]
        i = j = 0
        while i < len(theirs) or j < len(self._ours):
            their_place = (theirs[i][0], theirs[i][1], theirs[i][2]) if i < len(theirs) else (1 << 60, 0, 0)
            if j < len(self._ours):
                ours = self._ours[j][1]
                our_place = (ours.line, ours.column, ours.end_column)
            else:
                our_place = (1 << 60, 0, 0)
            if their_place == our_place:
                pairs.append((i, self._ours[j][0]))
                i, j = i + 1, j + 1
            elif their_place < our_place:
                what, marks = theirs[i][3:5]
                self._differ("names", f"missing: {what} {marks}", *their_place[:2], what)
                i += 1
            else:
                self._differ("names", f"too many: {ours.role}, {ours.kind}", *our_place[:2], ours.text)
                j += 1
        return pairs

    def _compare_pairs(self, pairs: list[tuple[int, int]]) -> None:
        to_ours = dict(pairs)
        self._scope_of: dict[int, int] = {}
        dotted = -1  # the segment in front in a dotted path
        for i, j in pairs:
            line, column, _, what, marks, receiver, scope = self._said["names"][i]
            occurrence = self._all[j]
            role, kind, flags, is_attribute = expected_of(what, marks)
            expects_symbol = not is_attribute and role != "keyword" and (role != "import" or kind is not None)
            if what in ("alias", "module") and self._follows(i, j):
                is_attribute, receiver, expects_symbol = True, dotted, False
            dotted = i
            text = occurrence.text
            spelled = self._said["rows"][line - 1][occurrence.column - 1 : occurrence.end_column - 1].decode("utf-8")
            if spelled != text:
                self._differ("names", f"{what} {marks}: spelled {spelled}", line, column, text)
            said = (occurrence.role, occurrence.kind, occurrence.is_attribute)
            if said != (role, kind, is_attribute):
                self._differ(
                    "names", f"{what} {marks} should be {role}, {kind}, {is_attribute}, is {said}", line, column, text
                )
            elif occurrence.flags != flags:
                more, less = sorted(occurrence.flags - flags), sorted(flags - occurrence.flags)
                self._differ("names", f"{what} {marks}: flags should have {less}, not {more}", line, column, text)
            elif occurrence.receiver != (None if receiver == -1 else to_ours.get(receiver)):
                self._differ("names", f"{what} {marks}: wrong receiver", line, column, text)
            elif (occurrence.symbol is not None) != expects_symbol:
                self._differ("names", f"{what} {marks}: symbol {occurrence.symbol}", line, column, text)
            if self._scope_of.setdefault(scope, occurrence.scope) != occurrence.scope:
                ours, theirs = self._scopes[occurrence.scope], self._said["scopes"][scope]
                self._differ("names", f"{what} {marks}: in {ours.kind}, not {theirs[0]}", line, column, text)
        mapped = Counter(self._scope_of.values())
        for scope, index in self._scope_of.items():
            theirs = self._said["scopes"][scope]
            if mapped[index] > 1 or self._scopes[index].kind != theirs[0]:
                self._differ("names", f"in {self._scopes[index].kind}, not {theirs[0]}", theirs[3], 0, theirs[1])

    def _follows(self, i: int, j: int) -> bool:
        """Whether a segment of a path stands behind another one."""
        if i == 0:
            return False
        name, before = self._said["names"][i], self._said["names"][i - 1]
        if before[3] != name[3]:
            return False
        row = name[0] - 1
        front = self._said["rows"][row][: name[1] - 1].rstrip()
        while (not front or front.endswith(b"\\")) and row > 0:  # the line goes on from the one above
            if not front:
                row -= 1
                front = self._said["rows"][row].rstrip()
            front = front.removesuffix(b"\\").rstrip()
        if not front.endswith(b"."):
            return False
        # In `from ..a import`, the dots stand behind a keyword.
        return not front.rstrip(b". \t").endswith(b"from") or before[0:2] == name[0:2]

    def _compare_scopes(self) -> None:
        """The place and the extent of each scope."""
        theirs: Counter[tuple[Any, ...]] = Counter()
        ours: Counter[tuple[Any, ...]] = Counter()
        for kind, name, _, first, last, _ in self._said["scopes"]:
            nameless = kind in ("module", "lambda", "comprehension")
            if kind in ("class", "function", "module"):
                theirs[kind, "" if nameless else name, first, last if kind != "module" else None] += 1
        exact = self._said["scopes"] and self._version >= (3, 8)
        for scope in self._scopes:
            if scope.kind in ("class", "function", "module"):
                last = scope.last_line if exact and scope.kind != "module" else None
                ours[scope.kind, scope.name, scope.first_line, last] += 1
        self._report.count("extents of scopes", len(self._scopes))
        for (kind, name, first, last), _ in (theirs - ours).items():
            self._differ("extents of scopes", f"missing: {kind}", first, 0, f"{name} to line {last}")
        for (kind, name, first, last), _ in (ours - theirs).items():
            self._differ("extents of scopes", f"too many: {kind}", first, 0, f"{name} to line {last}")

    def _compare_variables(self) -> None:
        """An occurrence belongs to the variable that the symbol of its scope stands for."""
        own: list[dict[str, Symbol]] = [{symbol.name: symbol for symbol in scope.symbols} for scope in self._scopes]
        for _, occurrence in self._ours:
            variable = occurrence.symbol
            if variable is None:
                continue
            self._report.count("variables")
            problem = self._problem_of(occurrence, variable, own)
            if problem:
                self._differ("variables", problem, occurrence.line, occurrence.column, occurrence.text)

    def _problem_of(self, occurrence: Occurrence, variable: Symbol, own: list[dict[str, Symbol]]) -> str:
        if variable.name != self._mangled(occurrence):
            return f"called {variable.name}"
        symbol = own[occurrence.scope].get(variable.name)
        if symbol is None:
            # Mentioned only by annotations that are never evaluated.
            if "annotation" in occurrence.flags:
                return ""
            # `(x): int` says nothing of x.
            front = self._said["rows"][occurrence.line - 1][: occurrence.column - 1].rstrip()
            is_bare = (occurrence.role, occurrence.kind) == ("definition", "variable")
            return "" if is_bare and front.endswith(b"(") else "in no table"
        if self._is_of_class(occurrence.scope, variable):
            return ""
        if symbol.is_free():
            if variable.name == "__class__" and self._scopes[variable.scope].kind == "class":
                return ""
            scope = self._scopes[occurrence.scope].parent
            while scope is not None:
                around = own[scope].get(variable.name)
                if around is not None and around.is_local() and self._scopes[scope].kind != "class":
                    break
                scope = self._scopes[scope].parent
            return "" if scope == variable.scope else "free, and another scope's"
        if symbol.is_global():
            return "" if variable.scope == 0 else "global, and not the module's"
        return "" if variable is symbol else "local, and another scope's"

    def _is_of_class(self, scope: int | None, variable: Symbol) -> bool:
        """Whether a scope of annotations sees the variable, as one of the class around it."""
        while scope is not None and self._scopes[scope].kind in ("annotation", "type parameters"):
            scope = self._scopes[scope].parent
            if scope == variable.scope and self._scopes[scope].kind == "class":
                return variable.is_local()
        return False

    def _mangled(self, occurrence: Occurrence) -> str:
        name = unicodedata.normalize("NFKC", occurrence.text)
        if not name.startswith("__") or name.endswith("__"):
            return name
        scope: int | None = occurrence.scope
        while scope is not None and self._scopes[scope].kind != "class":
            # The parameters of a generic class, its bases and their bounds are private to the class itself.
            below = self._scopes[scope]
            if below.kind == "type parameters" and self._opens_class(scope):
                mangled = self._private(below.name, name)
                # From 3.13 on only the names of the parameters are private there.
                own = {symbol.name for symbol in below.symbols if symbol.is_assigned()}
                if self._version < (3, 13) or mangled in own:
                    return mangled
            scope = below.parent
        return name if scope is None else self._private(self._scopes[scope].name, name)

    def _opens_class(self, scope: int) -> bool:
        return any(
            other.parent == scope and other.kind == "class" and other.name == self._scopes[scope].name
            for other in self._scopes[scope : scope + 50]
        )

    @staticmethod
    def _private(class_name: str, name: str) -> str:
        stripped = unicodedata.normalize("NFKC", class_name).lstrip("_")
        return f"_{stripped}{name}" if stripped else name

    def _compare_strings(self) -> None:
        """Names in strings and comments, which `ast` does not show: those of an annotation's string are what `ast`
        says of its text; all others are counted.
        """
        rest = [
            (index, occurrence) for index, occurrence in enumerate(self._all)
            if occurrence.flags & {"comment", "string"}
        ]  # fmt: skip
        self._compare_comments([o for _, o in rest if "comment" in o.flags])
        strings = [(i, o) for i, o in rest if "comment" not in o.flags]
        at = 0
        self._report.counts["names in strings"] += len(strings)
        for (line, column, last_line, end), names in self._said["strings"]:
            while at < len(strings) and (strings[at][1].line, strings[at][1].column) < (line, column):
                self._report.counts["names in strings beside annotations"] += 1
                at += 1
            found = []
            while at < len(strings) and (strings[at][1].line, strings[at][1].column) < (last_line, end):
                found.append(unicodedata.normalize("NFKC", strings[at][1].text))
                at += 1
            if names is None and not found:
                self._report.counts["strings of annotations that are no expressions"] += 1
                continue
            self._report.count("strings of annotations")
            if not found and line == last_line and b"\\" in self._said["rows"][line - 1][column - 1 : end - 1]:
                self._report.by_rule[Rule.ESCAPES] += 1
                continue
            if sorted(found) != (names or []):
                text = f"{sorted(found)}, not {names}"
                self._differ("strings of annotations", "other names", line, column, text)
        self._report.counts["names in strings beside annotations"] += len(strings) - at

    def _compare_comments(self, found: list[Occurrence]) -> None:
        """The names in a type comment are those of what its text is to `ast`."""
        by_line: dict[int, list[str]] = {}
        for occurrence in found:
            by_line.setdefault(occurrence.line, []).append(unicodedata.normalize("NFKC", occurrence.text))
        for line, names in by_line.items():
            self._report.count("type comments with names")
            row = self._said["rows"][line - 1].decode("utf-8")
            text = row[row.index("type:", row.index("#")) + len("type:") :].partition("#")[0].strip()
            try:
                tree = ast.parse(text, mode="func_type" if "->" in text else "eval")
            except SyntaxError:
                self._differ("type comments with names", "no expression", line, 0, text)
                continue
            expected = [getattr(node, "id", None) or getattr(node, "attr", "") for node in ast.walk(tree)]
            types = [*tree.argtypes, tree.returns] if isinstance(tree, ast.FunctionType) else [tree.body]
            for string in (string for part in types for string in strings_of_type(part)):
                expected += names_of_text(string.value) or []
            if sorted(names) != sorted(filter(None, expected)):
                self._differ("type comments with names", "other names", line, 0, f"{names}: {text}")


# ---- files and libraries ----


def answers_of_oracle(library: Library, paths: Sequence[Path]) -> Iterator[dict[str, Any]]:
    """What the interpreter of a library says of files, one by one."""
    command = [library.executable, "-W", "ignore", str(ORACLE)]
    with subprocess.Popen(command, stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True, encoding="utf-8") as run:
        assert run.stdin is not None
        assert run.stdout is not None
        stdin = run.stdin

        def ask() -> None:
            with stdin:
                for path in paths:
                    stdin.write(f"{path}\n")

        asking = threading.Thread(target=ask)
        asking.start()
        for line in run.stdout:
            yield json.loads(line)
        asking.join()


def compare(report: Report, path: Path, version: tuple[int, int], said: dict[str, Any]) -> None:
    """Adds one file."""
    if "refused" in said:
        report.refused += 1
        return
    report.files += 1
    report.count("files")
    if "failed" in said:
        report.differ("files", "not understood", f"{path}: {said['failed']}")
        return
    data = path.read_bytes()
    bindings = bind(data, version=version)
    source = to_utf8(data)
    rows = source.removeprefix(b"\xef\xbb\xbf").split(b"\n")
    said["rows"] = rows
    NamesComparison(report, str(path), version, said, bindings).run()
    theirs = table_of_symtable(said["table"])
    TableComparison(report, str(path), version, said).run(theirs, table_of_bindings(bindings, source))


def compare_library(library: Library, paths: Sequence[Path]) -> Report:
    """Compares files of a library."""
    report = Report(library.name)
    for path, said in zip(paths, answers_of_oracle(library, paths), strict=True):
        compare(report, path, library.version, said)
    return report


def text_table(head: list[str], rows: list[list[str]]) -> str:
    lines = [head, ["---", *("---:" for _ in head[1:])], *rows]
    return "".join(f"| {' | '.join(line)} |\n" for line in lines)


def tables(reports: Sequence[Report]) -> str:
    """The counts as tables of Markdown."""
    head = ["", *(report.name for report in reports)]
    whats = list(dict.fromkeys(what for report in reports for what in report.tallies))
    rows = [[what, *(f"{report.tallies.get(what, Tally()).compared:,}" for report in reports)] for what in whats]
    rows.append(["left over", *(f"{report.left_over:,}" for report in reports)])
    out = [text_table(head, rows), "\n"]
    met = [rule for rule in Rule if any(report.by_rule[rule] for report in reports)]
    rows = [[rule.value, *(f"{report.by_rule[rule]:,}" for report in reports)] for rule in met]
    out += [text_table(["rule", *head[1:]], rows), "\n"]
    counts = list(dict.fromkeys(what for report in reports for what in report.counts))
    out.append(text_table(["counted", *head[1:]], [[w, *(f"{r.counts[w]:,}" for r in reports)] for w in counts]))
    return "".join(out)


def sources_under(paths: Sequence[Path]) -> list[Path]:
    found = []
    for path in paths:
        inside = (
            sorted(p for p in path.rglob("*.py") if not NOT_THE_LIBRARY & set(p.parts)) if path.is_dir() else [path]
        )
        found += inside
    return found


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("paths", nargs="*", type=Path, metavar="FILE OR FOLDER", help="instead of the libraries")
    parser.add_argument("--python", action="append", metavar="VERSION", help="only this version, such as 3.12")
    parser.add_argument("--each-nth", type=int, default=1, metavar="N", help="only every N-th file")
    parser.add_argument("--write", action="store_true", help="put the table into docs/names-agreement.md")
    parser.add_argument("--examples", type=int, default=3, metavar="N", help="how many of each kind of difference")
    arguments = parser.parse_args()
    wanted = {tuple(map(int, version.split("."))) for version in arguments.python or ()} or set(VERSIONS)
    reports = []
    for version, library in libraries().items():
        if version not in wanted:
            continue
        paths = sources_under(arguments.paths) if arguments.paths else library.files()
        report = compare_library(library, paths[:: arguments.each_nth])
        reports.append(report)
        for kind, examples in sorted(report.left.items(), key=lambda item: -len(item[1])):
            print(f"{library.name}: {len(examples):,} x {kind}", file=sys.stderr)
            for example in examples[: arguments.examples]:
                print(f"    {example}", file=sys.stderr)
    print(tables(reports), end="")
    if arguments.write:
        text = DOCUMENT.read_text(encoding="utf-8")
        DOCUMENT.write_text(TABLE.sub(lambda _: tables(reports), text), encoding="utf-8")
    return 1 if any(report.left_over for report in reports) else 0


if __name__ == "__main__":
    sys.exit(main())
