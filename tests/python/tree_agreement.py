"""quillet's statements and expressions beside those of `ast`, file by file: kinds, structure, names and extents.

Both trees are put into one form, `Node`, and compared. For versions whose `ast` has less to say only the names are:
each one that the binder knows has to be found in the tree by its place. Run as a command it reads the libraries of
all Pythons that are found here; the exit code is 1 where a difference is left:

    python tests/python/tree_agreement.py                      every library
    python tests/python/tree_agreement.py --python 3.12        only of this version (may be repeated)
    python tests/python/tree_agreement.py FILE OR FOLDER...    as the running Python, if no other is told
    python tests/python/tree_agreement.py --each-nth 10
"""

from __future__ import annotations

import argparse
import pickle
import subprocess
import sys
import threading
import unicodedata
from collections import Counter
from collections.abc import Iterable, Iterator, Sequence
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any

if __name__ == "__main__":
    sys.path.insert(0, str(Path(__file__).resolve().parent.parent.parent / "scripts"))

from quillet import SourceEncodingError
from quillet._source import to_utf8
from quillet.tarvex import _host
from survey import Library, libraries
from tree_oracle import RECURSION_LIMIT, Node, node_of_hint, nodes_of

HERE = Path(__file__).resolve().parent
ORACLE = f"import sys; sys.path.insert(0, {str(HERE)!r}); import tree_oracle; tree_oracle.main()"

# Codes of tokens, as quillet numbers them.
OPERATORS = {
    14: "Add", 15: "Sub", 16: "Mult", 17: "Div", 18: "BitOr", 19: "BitAnd", 24: "Mod", 32: "Invert", 33: "BitXor",
    34: "LShift", 35: "RShift", 36: "Pow", 48: "FloorDiv", 50: "MatMult", 37: "Add", 38: "Sub", 39: "Mult", 40: "Div",
    41: "Mod", 42: "BitAnd", 43: "BitOr", 44: "BitXor", 45: "LShift", 46: "RShift", 47: "Pow", 49: "FloorDiv",
    51: "MatMult",
}  # fmt: skip
AND = 128  # the first of the words
UNARY = {14: "UAdd", 15: "USub", 32: "Invert"}
COMPARE = ("Eq", "NotEq", "Lt", "Gt", "LtE", "GtE", "Is", "IsNot", "In", "NotIn")
PARAMETERS = ("plain", "*", "**", "bare *", "/")

PARENTHESIZED, TRAILING_COMMA, IS_STAR, ASYNC_CLAUSE, HOLDS_HINT, IS_TARGET, IS_BROKEN = (1 << bit for bit in range(7))
ASYNC_STMT, EXCEPT_GROUP, HAS_YIELD, HINT_IS_COMMENT, STMT_IS_BROKEN, HAS_RETURN_VALUE = (1 << bit for bit in range(6))


# ---- quillet's ----


@dataclass
class Expr:
    kind: str
    op: int
    flags: int
    begin: int
    end: int
    name: tuple[int, int]
    parent: int
    children: list[int]


@dataclass
class Stmt:
    kind: str
    op: int
    flags: int
    begin: int
    end: int
    block_end: int
    parent: int
    first_child: int
    next: int
    hint: int
    name: tuple[int, int]
    decorators: int
    type_parameters: int
    exprs: list[int]


class Tree:
    """What quillet says of a source."""

    def __init__(self, source: bytes, version: tuple[int, int]) -> None:
        self.source = source
        self.exprs: list[Expr] = []
        self.stmts: list[Stmt] = []
        self.lost: list[tuple[int, int, int]] = []
        self.occurrences = 0
        for line in _host.SyntaxLines((*version, 0), source).split("\n")[:-1]:
            sort, *words = line.split(" ")
            if sort == "E":
                op, flags, begin, end, name_begin, name_end, parent, *children = map(int, words[1:])
                name = (name_begin, name_end)
                self.exprs.append(Expr(words[0], op, flags, begin, end, name, parent, children))
            elif sort == "S":
                numbers = list(map(int, words[1:]))
                op, flags, begin, end, block_end, parent, first_child, following, hint = numbers[:9]
                name, counts = (numbers[9], numbers[10]), (numbers[11], numbers[12])
                places = (op, flags, begin, end, block_end, parent, first_child, following, hint)
                self.stmts.append(Stmt(words[0], *places, name, *counts, numbers[13:]))
            elif sort == "B":
                self.occurrences = int(words[0])
            else:
                begin, end, flags = map(int, words)
                self.lost.append((begin, end, flags))

    def name_of(self, name: tuple[int, int]) -> str:
        return unicodedata.normalize("NFKC", self.source[name[0] : name[1]].decode("utf-8"))

    def module(self) -> list[Node | None]:
        return self.block(0)

    def block(self, parent: int) -> list[Node | None]:
        nodes: list[Node | None] = []
        at = self.stmts[parent].first_child
        while at != 0:
            nodes.append(self.statement(at))
            at = self.stmts[at].next
        return nodes

    def statement(self, number: int) -> Node:
        stmt = self.stmts[number]
        exprs: list[Node | None] = self.all(stmt.exprs)
        if stmt.hint and not stmt.flags & HINT_IS_COMMENT:
            exprs.append(Node("Hint", children=[self.expr(stmt.hint)]))
        detail: tuple[Any, ...] = (stmt.flags & (ASYNC_STMT | EXCEPT_GROUP | STMT_IS_BROKEN),)
        if stmt.kind in ("Def", "Class", "TypeAlias"):
            detail += (self.name_of(stmt.name), stmt.decorators, stmt.type_parameters)
        if stmt.kind == "Def":
            detail += (bool(stmt.flags & HAS_YIELD), bool(stmt.flags & HAS_RETURN_VALUE))
        if stmt.kind == "AugmentedAssign":
            detail += (OPERATORS[stmt.op],)
        if stmt.kind == "Pass":
            detail += (self.source[stmt.begin : stmt.end],)
        children = self.block(number)
        return Node(stmt.kind, detail, stmt.begin, stmt.block_end, [*exprs, Node("Block", children=children)])

    def all(self, numbers: Iterable[int]) -> list[Node | None]:
        return [self.expr(number) if number else None for number in numbers]

    def expr(self, number: int) -> Node:
        expr = self.exprs[number]
        node = Node(expr.kind, (), expr.begin, expr.end)
        is_target = bool(expr.flags & IS_TARGET)
        is_broken = bool(expr.flags & IS_BROKEN)
        children = expr.children
        match expr.kind:
            case "Name" | "Attribute":
                node.detail = (self.name_of(expr.name), is_target)
            case "Subscript":
                node.detail = (is_target,)
                # What `ast` has is the same for `x[a, b]` and `x[(a, b)]`.
                item = self.exprs[children[1]]
                is_tuple = item.kind in ("Tuple", "Starred") or len(children) > 2 or bool(expr.flags & TRAILING_COMMA)
                items = item.children if item.kind == "Tuple" and len(children) == 2 else children[1:]
                if item.kind == "Tuple" and len(children) == 2 and expr.flags & TRAILING_COMMA:
                    items = children[1:]
                node.detail = (is_target, is_tuple)
                children = [children[0], *items]
            case "Number":
                node.detail = (("int", "int", "float", "complex")[expr.op],)
            case "String":
                node.detail = (bool(expr.op & 1), bool(expr.op & 12))
                if expr.flags & HOLDS_HINT:
                    node.detail += ("hint",)
            case "Constant":
                node.detail = (("None", "True", "False", "Ellipsis")[expr.op],)
            case "Keyword" | "PatternStar" | "PatternCapture":
                node.detail = (self.name_of(expr.name),)
            case "Unary":
                node.detail = (UNARY.get(expr.op, "Not"),)
            case "Binary":
                node.detail = (OPERATORS[expr.op],)
            case "Boolean":
                node.detail = ("And" if expr.op == AND else "Or",)
                # One of three is two of two.
                flat: list[int] = []
                first = number
                while self.exprs[first].kind == "Boolean" and self.exprs[first].op == expr.op:
                    if first != number and self.exprs[first].flags & PARENTHESIZED:
                        break
                    flat.insert(0, self.exprs[first].children[1])
                    first = self.exprs[first].children[0]
                children = [first, *flat]
            case "Compare":
                node.detail = (COMPARE[expr.op],)
            case "Parameter":
                name = self.name_of(expr.name)
                node.detail = (PARAMETERS[expr.op], name, expr.name[0] if name else None)
                node.begin = node.end = None
                children = [*children, 0, 0, 0][:3]
            case "TypeParameter":
                node.detail = (PARAMETERS[expr.op], self.name_of(expr.name))
                children = [*children, 0, 0][:2]
            case "ComprehensionFor":
                node.detail = (bool(expr.flags & ASYNC_CLAUSE),)
                node.begin = node.end = None
            case "ModulePath":
                node.detail = (expr.op,)
                node.begin = node.end = None
            case "ImportAlias":
                node.detail = (bool(expr.flags & IS_STAR),)
            case "WithItem":
                node.begin = node.end = None
        if is_broken:
            node.detail += ("broken",)
        node.children = self.all(children)
        return node


# ---- the comparison ----


@dataclass
class Report:
    name: str
    files: int = 0
    refused: int = 0
    nodes: int = 0
    hints: int = 0
    occurrences: int = 0
    differences: Counter[str] = field(default_factory=Counter)
    examples: dict[str, list[str]] = field(default_factory=dict)

    def __str__(self) -> str:
        return (
            f"{self.name}: {self.files:,} files ({self.refused:,} refused), {self.nodes:,} nodes, "
            f"{self.hints:,} hints, {self.occurrences:,} names, {self.differences.total():,} differences"
        )

    def differ(self, what: str, where: str) -> None:
        self.differences[what] += 1
        examples = self.examples.setdefault(what, [])
        if len(examples) < 5:
            examples.append(where)


class Comparison:
    """One source."""

    def __init__(self, report: Report, name: str, source: bytes) -> None:
        self.report = report
        self.name = name
        self.source = source

    def run(self, said: list[Node | None] | None, tree: Tree) -> None:
        if said is not None:
            self.compare_all("Module", said, tree.module(), 0)
        self.report.occurrences += tree.occurrences
        for begin, end, flags in tree.lost:
            self.differ(f"a name is not found, flags {flags}", begin, self.source[begin:end].decode("utf-8", "replace"))

    def differ(self, what: str, place: int, text: str = "") -> None:
        line = self.source.count(b"\n", 0, place) + 1
        self.report.differ(what, f"{self.name}:{line}: {text}")

    def compare_all(self, kind: str, theirs: Sequence[Node | None], ours: Sequence[Node | None], place: int) -> None:
        if len(theirs) != len(ours):
            text = f"{[node and node.kind for node in ours]}, not {[node and node.kind for node in theirs]}"
            self.differ(f"number of children of {kind}", place, text[:300])
            return
        for expected, found in zip(theirs, ours, strict=True):
            if expected is None or found is None:
                if expected is not found:
                    self.differ(f"an absent child of {kind}", place)
                continue
            self.compare(expected, found, place)

    def compare(self, expected: Node, found: Node, place: int) -> None:
        self.report.nodes += 1
        place = found.begin if found.begin is not None else place
        if expected.kind != found.kind:
            self.differ(f"{expected.kind} is {found.kind}", place)
            return
        if expected.kind == "String":
            self.compare_string(expected, found, place)
            return
        if expected.detail != found.detail:
            details = zip(expected.detail, found.detail, strict=False)
            # A place that is not known.
            if len(expected.detail) != len(found.detail) or any(e != f for e, f in details if e is not None):
                self.differ(f"detail of {expected.kind}", place, f"{found.detail}, not {expected.detail}")
        self.compare_extent(expected, found, place)
        self.compare_all(expected.kind, expected.children, found.children, place)

    def compare_extent(self, expected: Node, found: Node, place: int) -> None:
        for what, theirs, ours in (("begin", expected.begin, found.begin), ("end", expected.end, found.end)):
            if theirs is not None and ours is not None and theirs != ours:
                self.differ(f"{what} of {expected.kind}", place, f"{ours}, not {theirs}")

    def compare_string(self, expected: Node, found: Node, place: int) -> None:
        self.compare_extent(expected, found, place)
        if found.detail[:2] != expected.detail[:2]:
            self.differ("detail of String", place, f"{found.detail}, not {expected.detail}")
        elif "hint" in found.detail:
            self.report.hints += 1
            said = node_of_hint(expected.detail[2])
            if said is None:
                self.differ("a hint that is no expression", place, expected.detail[2])
                return
            self.compare_all("hint", [said], found.children, place)
        else:
            self.compare_all("String", expected.children, found.children, place)


def answers_of_oracle(executable: str, files: Sequence[tuple[bytes, bytes]]) -> Iterator[list[Node | None] | None]:
    """What another Python's `ast` says of sources, one by one."""
    with subprocess.Popen([executable, "-c", ORACLE], stdin=subprocess.PIPE, stdout=subprocess.PIPE) as run:
        assert run.stdin is not None
        assert run.stdout is not None
        stdin = run.stdin

        def ask() -> None:
            with stdin:
                for file in files:
                    pickle.dump(file, stdin)

        asking = threading.Thread(target=ask)
        asking.start()
        for _ in files:
            yield pickle.load(run.stdout)
        asking.join()


def answers(library: Library, files: Sequence[tuple[bytes, bytes]]) -> Iterator[list[Node | None] | None]:
    if library.version == sys.version_info[:2]:
        return (nodes_of(*file) for file in files)
    if library.version >= (3, 10):
        return answers_of_oracle(library.executable, files)
    return iter([None] * len(files))


def compare_library(library: Library, paths: Sequence[Path]) -> Report:
    """Compares files, read as those of a library."""
    report = Report(library.name)
    sources = []
    accepted = []
    refusals = library.refusals(paths)
    for path in paths:
        data = path.read_bytes()
        try:
            source = to_utf8(data)
        except SourceEncodingError:
            source = None
        if source is None or path in refusals:
            report.refused += 1
            continue
        accepted.append(path)
        sources.append((data, source))
    for path, (_, source), said in zip(accepted, sources, answers(library, sources), strict=True):
        report.files += 1
        Comparison(report, str(path), source).run(said, Tree(source, library.version))
    return report


def sources_under(paths: Iterable[Path]) -> list[Path]:
    found = []
    for path in paths:
        inside = sorted(file for file in path.rglob("*.py*") if file.suffix in (".py", ".pyi"))
        found += inside if path.is_dir() else [path]
    return found


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("paths", nargs="*", type=Path, metavar="FILE OR FOLDER", help="instead of the libraries")
    parser.add_argument("--python", action="append", metavar="VERSION", help="only this version, such as 3.12")
    parser.add_argument("--each-nth", type=int, default=1, metavar="N", help="only every N-th file")
    arguments = parser.parse_args()
    sys.setrecursionlimit(RECURSION_LIMIT)
    wanted = {tuple(map(int, version.split("."))) for version in arguments.python or ()}
    if not wanted and arguments.paths:
        wanted = {sys.version_info[:2]}
    differences = 0
    for version, library in libraries().items():
        if wanted and version not in wanted:
            continue
        paths = sources_under(arguments.paths) if arguments.paths else library.files()
        report = compare_library(library, paths[:: arguments.each_nth])
        differences += report.differences.total()
        for what, count in report.differences.most_common():
            print(f"{library.name}: {count:,} x {what}", file=sys.stderr)
            for example in report.examples[what]:
                print(f"    {example}", file=sys.stderr)
        print(report)
    return 1 if differences else 0


if __name__ == "__main__":
    sys.exit(main())
