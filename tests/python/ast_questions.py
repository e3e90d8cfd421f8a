"""Answers the questions of `quillet find` with `ast` alone, for comparison: who calls, imports, passes, inherits ...

An answer is a place (path, line, column), columns in UTF-8 bytes from 1, where the name stands; for a dotted name
where it begins, and behind a call or a subscript where the first name behind it stands. Nothing of quillet is
used here, so it may run under any Python from 3.10 on. Up to 3.11 that knows no places inside of f-strings: these
are given as ranges that are to be left out.

    python tests/python/ast_questions.py FOLDER COUNT   questions and answers as JSON, for COUNT names a kind
"""

from __future__ import annotations

import ast
import json
import random
import re
import sys
import warnings
from collections import defaultdict
from collections.abc import Iterator
from pathlib import Path

Place = tuple[str, int, int]

# How each question is typed: the option, and whether the name is asked for behind a dot ("."), alone ("") or as
# both ("any").
QUESTIONS = {
    "callers of a function": ("call", ""),
    "callers of a method of a unique name": ("call", "."),
    "callers of a method of a common name": ("call", "."),
    "importers of a module": ("import", ""),
    "passers of a keyword": ("keyword", ""),
    "subclasses": ("base", "any"),
    "raisers": ("raise", "any"),
    "overrides": ("def", ""),
    "setters of an attribute": ("set", "."),
    "readers of an attribute": ("get", "."),
    "all uses of a function": ("", ""),
    "all uses of a class": ("", ""),
    "decorated by": ("decorator", "any"),
}


class Answers(ast.NodeVisitor):
    """The answers of one file: by kind of use and name, the places."""

    def __init__(self, path: str, source: bytes) -> None:
        self.path = path
        self.lines = source.splitlines(keepends=True)
        self.places: dict[str, dict[str, set[tuple[int, int]]]] = defaultdict(lambda: defaultdict(set))
        self.strings: list[tuple[int, int, int, int]] = []
        self.functions: set[str] = set()
        self.classes: set[str] = set()
        self.visit(ast.parse(source))

    def add(self, kind: str, name: str, place: tuple[int, int]) -> None:
        self.places[kind][name].add(place)

    # ---- places ----

    def chain(self, node: ast.expr) -> tuple[str, tuple[int, int]] | None:
        """The dotted name of an expression and where it begins; None where it ends in no name."""
        names = []
        while isinstance(node, ast.Attribute):
            names.append(node.attr)
            place = _end(node)[0], _end(node)[1] - len(node.attr.encode()) + 1
            node = node.value
        if isinstance(node, ast.Name):
            names.append(node.id)
            return ".".join(reversed(names)), (node.lineno, node.col_offset + 1)
        return ("." + ".".join(reversed(names)), place) if names else None

    def find(self, text: str, line: int, column: int) -> tuple[int, int]:
        """Where a word stands from a place on, which it is known to."""
        pattern = re.compile(rb"(?<!\w)" + re.escape(text.encode()) + rb"(?!\w)")
        found = pattern.search(self.lines[line - 1], column)
        while found is None:
            line += 1
            found = pattern.search(self.lines[line - 1])
        return line, found.start() + 1

    # ---- uses ----

    def use(self, node: ast.expr, kind: str) -> None:
        """An expression is used as that, by its own name and by the last part of it."""
        found = self.chain(node)
        if found is None:
            return
        name, place = found
        last = name.rpartition(".")[2]
        if "." in name:
            self.add(f"{kind} .", last, place)
        else:
            self.add(f"{kind} ", name, place)
        self.add(f"{kind} any", last, place)

    def visit_Name(self, node: ast.Name) -> None:
        self.add(" ", node.id, (node.lineno, node.col_offset + 1))

    def visit_Attribute(self, node: ast.Attribute) -> None:
        # The operand of "del" is read.
        self.use(node, "set" if isinstance(node.ctx, ast.Store) else "get")
        self.generic_visit(node)

    def visit_AugAssign(self, node: ast.AugAssign) -> None:
        if isinstance(node.target, ast.Attribute):
            self.use(node.target, "get")  # before it is set
        self.generic_visit(node)

    def visit_Call(self, node: ast.Call) -> None:
        self.use(node.func, "call")
        self.keywords(node.keywords)
        self.generic_visit(node)

    def keywords(self, keywords: list[ast.keyword]) -> None:
        for keyword in keywords:
            if keyword.arg is not None:
                place = keyword.lineno, keyword.col_offset + 1
                self.add("keyword ", keyword.arg, place)
                self.add(" ", keyword.arg, place)

    def visit_Import(self, node: ast.Import) -> None:
        for alias in node.names:
            self.module(alias.name, (alias.lineno, alias.col_offset + 1))
            self.imported(alias, alias.name.partition(".")[0])

    def visit_ImportFrom(self, node: ast.ImportFrom) -> None:
        if node.module is not None:
            place = self.find(node.module.partition(".")[0], node.lineno, node.col_offset + len("from"))
            self.module(node.module, place)
            self.add(" ", node.module.partition(".")[0], place)
        for alias in node.names:
            self.imported(alias, alias.name)
            # It may be a module; where it has another name here, it is bound by that.
            self.add("import ", alias.name, (alias.lineno, alias.col_offset + 1))
            if node.module is not None and alias.name != "*":
                place = alias.lineno, alias.col_offset + 1
                if alias.asname is not None:
                    begin = alias.col_offset + len(alias.name.encode())
                    place = self.find(alias.asname, *self.behind_as(alias.lineno, begin))
                self.add("import ", f"{node.module}.{alias.name}", place)

    def module(self, name: str, place: tuple[int, int]) -> None:
        """An import runs all modules around the one that it names. Dots in front of them are no part of the name."""
        while name:
            self.add("import ", name, place)
            name = name.rpartition(".")[0]

    def imported(self, alias: ast.alias, name: str) -> None:
        self.add(" ", name, (alias.lineno, alias.col_offset + 1))
        if alias.asname is not None:
            begin = alias.col_offset + len(alias.name.encode())
            place = self.find(alias.asname, *self.behind_as(alias.lineno, begin))
            self.add(" ", alias.asname, place)
            self.add("import ", alias.asname, place)

    def behind_as(self, line: int, column: int) -> tuple[int, int]:
        line, column = self.find("as", line, column)
        return line, column + 1

    def definition(self, node: ast.FunctionDef | ast.AsyncFunctionDef | ast.ClassDef, word: str) -> None:
        line, column = self.find(word, node.lineno, node.col_offset)
        place = self.find(node.name, line, column - 1 + len(word))
        self.add("def ", node.name, place)
        self.add(" ", node.name, place)
        for decorator in node.decorator_list:
            self.use(decorator.func if isinstance(decorator, ast.Call) else decorator, "decorator")

    def visit_FunctionDef(self, node: ast.FunctionDef | ast.AsyncFunctionDef) -> None:
        self.functions.add(node.name)
        self.definition(node, "def")
        self.generic_visit(node)

    def visit_AsyncFunctionDef(self, node: ast.AsyncFunctionDef) -> None:
        self.visit_FunctionDef(node)

    def visit_ClassDef(self, node: ast.ClassDef) -> None:
        self.classes.add(node.name)
        self.definition(node, "class")
        for base in node.bases:
            self.use(base.value if isinstance(base, ast.Subscript) else base, "base")
        self.keywords(node.keywords)
        self.generic_visit(node)

    def visit_Raise(self, node: ast.Raise) -> None:
        if node.exc is not None:
            self.use(node.exc.func if isinstance(node.exc, ast.Call) else node.exc, "raise")
        self.generic_visit(node)

    def visit_arg(self, node: ast.arg) -> None:
        self.add(" ", node.arg, (node.lineno, node.col_offset + 1))
        self.generic_visit(node)

    def visit_ExceptHandler(self, node: ast.ExceptHandler) -> None:
        if node.name is not None:
            self.add(" ", node.name, self.find(node.name, *self.behind_as(*_end(node.type or node))))
        self.generic_visit(node)

    def visit_Global(self, node: ast.Global | ast.Nonlocal) -> None:
        line, column = node.lineno, node.col_offset + len("global")
        for name in node.names:
            line, column = self.find(name, line, column)
            self.add(" ", name, (line, column))

    def visit_Nonlocal(self, node: ast.Nonlocal) -> None:
        self.visit_Global(node)

    def visit_MatchAs(self, node: ast.MatchAs) -> None:
        if node.name is not None and node.pattern is None:
            self.add(" ", node.name, (node.lineno, node.col_offset + 1))
        elif node.name is not None and node.pattern is not None:
            self.add(" ", node.name, self.find(node.name, *self.behind_as(*_end(node.pattern))))
        self.generic_visit(node)

    def visit_MatchClass(self, node: ast.MatchClass) -> None:
        line, column = _end(node.patterns[-1] if node.patterns else node.cls)
        for name, pattern in zip(node.kwd_attrs, node.kwd_patterns, strict=True):
            place = self.find(name, line, column)
            self.add("keyword ", name, place)
            self.add(" ", name, place)
            line, column = _end(pattern)
        self.generic_visit(node)

    def visit_MatchStar(self, node: ast.MatchStar) -> None:
        if node.name is not None:
            self.add(" ", node.name, self.find(node.name, node.lineno, node.col_offset))

    def visit_MatchMapping(self, node: ast.MatchMapping) -> None:
        if node.rest is not None:
            end = _end(node.patterns[-1]) if node.patterns else (node.lineno, node.col_offset)
            self.add(" ", node.rest, self.find(node.rest, *end))
        self.generic_visit(node)

    def visit_JoinedStr(self, node: ast.JoinedStr) -> None:
        if sys.version_info >= (3, 12):
            self.generic_visit(node)
        else:
            self.strings.append((node.lineno, node.col_offset + 1, *_end(node)))


def _end(node: ast.expr | ast.pattern | ast.ExceptHandler) -> tuple[int, int]:
    assert node.end_lineno is not None
    assert node.end_col_offset is not None
    return node.end_lineno, node.end_col_offset


def answers_of(folder: Path) -> Iterator[Answers]:
    """The answers of all files that this Python reads."""
    for path in sorted(folder.rglob("*.py")):
        source = path.read_bytes()
        if source.startswith(b"\xef\xbb\xbf") or re.match(rb"(.*\n)?.*coding[:=][ \t]*(?!utf-?8)", source[:200]):
            continue
        if b"\f" in source or re.search(rb"\r(?!\n)", source):
            continue  # which count as line ends for some, and not for others
        try:
            with warnings.catch_warnings():
                warnings.simplefilter("ignore")
                yield Answers(str(path.relative_to(folder)), source)
        except (SyntaxError, ValueError, RecursionError):
            continue


def ask(folder: Path, count: int) -> dict[str, object]:
    """Questions, with `count` names for each, and their answers; the files that were read, and what is left out."""
    places: dict[str, dict[str, list[Place]]] = defaultdict(lambda: defaultdict(list))
    files = []
    strings = {}
    functions: set[str] = set()
    classes: set[str] = set()
    for answers in answers_of(folder):
        files.append(answers.path)
        functions |= answers.functions
        classes |= answers.classes
        strings[answers.path] = answers.strings
        for kind, names in answers.places.items():
            for name, found in names.items():
                places[kind][name] += [(answers.path, *place) for place in sorted(found)]
    chance = random.Random(1)
    asked = {}
    for title, (option, form) in QUESTIONS.items():
        known = places[f"{option} {form}"]
        names = sorted(known, key=lambda name: (-len(known[name]), name))
        if "unique" in title:
            defined = places["def "]
            names = [name for name in names if len(defined.get(name, ())) == 1]
        elif "method" in title:
            names = names[: 3 * count]
        elif title == "overrides":
            names = [name for name in names if len(known[name]) > 1]
        elif title.startswith("all uses"):
            wanted = functions if "function" in title else classes
            names = [name for name in names if name in wanted]
        elif title == "callers of a function":
            names = [name for name in names if name in functions]
        chosen = [*names[: (count + 1) // 2], *chance.sample(names, min(count, len(names)))]
        asked[title] = {name: known[name] for name in list(dict.fromkeys(chosen))[:count]}
    return {"python": "{}.{}".format(*sys.version_info), "files": files, "strings": strings, "asked": asked}


if __name__ == "__main__":
    json.dump(ask(Path(sys.argv[1]), int(sys.argv[2])), sys.stdout)
