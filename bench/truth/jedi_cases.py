"""jedi's test/completion: types, completions, definitions and references at marked places of its own test files.

A comment says what is expected at the next line's end, or at the column that it begins with: `#? int()` the types,
`#? ['upper']` the completions, `#! ['def f']` the definitions, `#< (0,4), (2,0)` the references by lines counted from
the next one. The folder `thirdparty` is left out, which needs libraries that the set does not hold.

An expected type is compared by the last part of its name: `int()` is an instance of builtins.int, `int` the class, the
function or the module. Where that does not agree, the expected expression is put on a line of its own before the case
and its types are asked for, which is how the set itself reads it. A completion agrees where the names that begin as
what is typed does are the expected ones.
"""

from __future__ import annotations

import argparse
import ast
import re
from collections.abc import Iterator
from pathlib import Path
from typing import NamedTuple

from bench.truth.engine import ENGINES, AddEngine, Answer, Engine
from bench.truth.halves import AddHalf, InHalf
from bench.truth.places import Cut, Found, Place, ReadText
from bench.truth.tally import AddFailures, Tally

HOW_TO_GET = "pip download --no-deps --no-binary jedi jedi, and unpack it; the folder is test/completion in it"
_CASE = re.compile(r"(?:^|(?<=\s))#([?!<])\s*([^\n]*)")
_VERSION = re.compile(r" *# *python *([<>]=?|==) *(\d+(?:\.\d+)?)$")
_WORD = re.compile(r"\w+\Z")
_NAMED = re.compile(r"[\w.]+(\(\))?\Z")
_UNKNOWN = {"", "typing.Any", "Any", "Unknown", "builtins.object"}
GROUPS = {"!": "definitions", "<": "references"}


class Case(NamedTuple):
    """What is expected at a place. `line` is that of the comment; the place is on the next one."""

    kind: str
    expected: str
    line: int
    column: int
    version: tuple[str, tuple[int, ...]] | None


def Key(name: str, kind: str, line: int) -> str:
    return name if kind == "?" else f"{name}:{line}"


def ParseCases(name: str, lines: list[str], half: str | None = None) -> Iterator[Case]:
    """The cases of a file; of those in the other half neither the comment is read nor the line behind it."""
    version = None
    previous: tuple[str, str] | None = None
    skip = False
    for number, line in enumerate(lines, 1):
        if skip:
            skip = False
        elif previous is not None:
            kind, expected = previous
            previous = None
            column = len(line)
            if at := re.match(r"(\d+)\s*(.*)$", expected):
                column, expected = int(at[1]), at[2]
            if kind == "?":
                kind = "completions" if expected.startswith("[") else "types"
            yield Case(GROUPS.get(kind, kind), expected.strip(), number - 1, min(column, len(line)), version)
        elif found := _VERSION.match(line):
            version = found[1], tuple(map(int, found[2].split(".")))
        elif found := _CASE.search(line):
            if half is None or InHalf(Key(name, found[1], number), half):
                previous = found[1], found[2]
            else:
                skip = True


def IsFor(case: Case, version: tuple[int, ...]) -> bool:
    """Whether a case is meant for a version of Python."""
    if case.version is None:
        return True
    sign, wanted = case.version
    have = version[: len(wanted)]
    return {
        "<": have < wanted,
        "<=": have <= wanted,
        "==": have == wanted,
        ">=": have >= wanted,
        ">": have > wanted,
    }[sign]


# --- types


def Tag(text: str) -> str | None:
    """A type's text as the case writes it: `int()`, `int`, `None`; None where nothing is known."""
    if text in _UNKNOWN:
        return None
    if text.startswith(("def ", "async def ")):
        return "def"
    if inside := re.match(r"type\[(.*)\]\Z", text):
        return _Last(inside[1])
    if text.startswith("module "):
        return _Last(text[len("module ") :])
    return "None" if text in ("None", "builtins.None") else f"{_Last(text)}()"


def _Last(text: str) -> str:
    return text.split("[")[0].rpartition(".")[2]


def ExpectedTag(expression: str) -> str | None:
    """The same of what a case expects, where a name says it; None where it takes an engine to know."""
    if expression == "None":
        return "None"
    if not _NAMED.match(expression):
        return None
    return expression.rpartition(".")[2]


def SameTypes(expected: list[str], given: list[str]) -> bool:
    """Whether the names of what is expected and of what is given pair up. `def` stands for any function."""
    wanted = {ExpectedTag(each) or "?" for each in expected}
    tags = {tag for tag in map(Tag, given) if tag is not None}
    functions = {tag for tag in wanted if tag not in tags and (not tag.endswith("()") or tag == "Callable()")}
    if "def" in tags and functions:
        tags.discard("def")
        wanted -= functions
    return tags == wanted


# --- definitions


def Describe(found: Found, lines: list[str]) -> str:
    """A definition in the words of a case: `def f`, `class C`, `module m`, `param x=1`, or the statement's own text."""
    path = Path(found.path)
    if found.kind == "module":
        return f"module {path.parent.name if path.stem == '__init__' else path.stem}"
    line = lines[found.line - 1] if found.line <= len(lines) else ""
    name = line[found.column : found.end]
    if found.kind in ("function", "class"):
        return f"{'def' if found.kind == 'function' else 'class'} {name}"
    import parso  # only these cases need it

    name_node = parso.parse("\n".join(lines)).get_name_of_position((found.line, found.column))
    if name_node is None:
        return " ".join(line.split())
    node = name_node.get_definition(include_setitem=True) or name_node
    text = node.get_code(include_prefix=False)
    if node.type == "param":
        text = "param " + text.rstrip(", ")
    return " ".join(re.sub(r"#[^\n]+\n", " ", text).split())


# --- references


def ExpectedPlaces(expected: str, module: str, line: int) -> list[tuple[str, int | None, int]]:
    """(module, line, column) of each expected reference; the line is None where any will do."""
    places: list[tuple[str, int | None, int]] = []
    for each in ast.literal_eval(expected) if expected else ():
        if isinstance(each[0], str):
            places.append((each[0], None if each[1] is ... else each[1], each[2]))
        else:
            places.append((module, line + each[0], each[1]))
    return places


def GivenPlace(found: Found, folder: Path) -> tuple[str, int, int]:
    path = Path(found.path)
    parts = path.relative_to(folder).with_suffix("").parts if path.is_relative_to(folder) else (path.stem,)
    module = ".".join(parts[:-1] if parts[-1] == "__init__" and len(parts) > 1 else parts)
    return ("stub:" if path.suffix == ".pyi" else "") + module, found.line, found.column


def SamePlaces(expected: list[tuple[str, int | None, int]], given: set[tuple[str, int, int]]) -> bool:
    exact = {each for each in expected if each[1] is not None}
    loose = {(each[0], each[2]) for each in expected if each[1] is None}
    rest = given - exact
    return exact <= given and {(each[0], each[2]) for each in rest} == loose


# --- the runner


class Questions:
    """Asks an engine what a case asks, and says whether the answer is the expected one, what was expected and given."""

    def __init__(self, folder: Path, path: Path, engine: Engine) -> None:
        self._folder = folder
        self._path = str(path)
        self._module = path.stem
        self._text = ReadText(path)
        self._lines = Cut(self._text)
        self._engine = engine

    def _Cursor(self, case: Case) -> Place:
        return Place(self._path, case.line + 1, case.column)

    def _Place(self, case: Case) -> Place:
        """Where the name begins that the cursor is in or behind."""
        before = _WORD.search(self._lines[case.line][: case.column])
        return Place(self._path, case.line + 1, before.start() if before else case.column)

    def Ask(self, case: Case) -> tuple[bool, object, object]:
        asked = {
            "types": self._Types,
            "completions": self._Completions,
            "definitions": self._Definitions,
            "references": self._References,
        }
        return asked[case.kind](case)

    def _Types(self, case: Case) -> tuple[bool, object, object]:
        expected = case.expected.split()
        given = self._engine.TypesBefore(self._Cursor(case))
        if SameTypes(expected, given):
            return True, expected, given
        if not expected or not given:
            return False, expected, given
        wanted: set[str] = set()
        for expression in expected:
            wanted |= set(self._TypesOf(expression, case))
        return bool(wanted) and wanted == set(given), f"{case.expected} ({', '.join(sorted(wanted))})", given

    def _TypesOf(self, expression: str, case: Case) -> list[str]:
        """The types of an expression in a line of its own before the case."""
        line = self._lines[case.line]
        indent = line[: len(line) - len(line.lstrip())]
        lines = [*self._lines[: case.line], f"{indent}expected_ = {expression}", *self._lines[case.line :]]
        self._engine.Open(self._path, "\n".join(lines))
        types = self._engine.Types(Place(self._path, case.line + 1, len(indent)))
        self._engine.Close(self._path)
        return types

    def _Completions(self, case: Case) -> tuple[bool, object, object]:
        expected = {name.rstrip("=") for name in ast.literal_eval(case.expected)}
        before = self._lines[case.line][: case.column]
        word = _WORD.search(before)
        typed = word[0].lower() if word else ""
        names = self._engine.Complete(self._Cursor(case))
        given = {name.rstrip("=") for name in names if name.lower().startswith(typed)}
        return given == expected, expected, sorted(given)[:40]

    def _Definitions(self, case: Case) -> tuple[bool, object, object]:
        expected = sorted(ast.literal_eval(case.expected))
        found = Answer(self._engine.Definitions(self._Place(case)))
        given = sorted(Describe(each, Cut(ReadText(each.path))) for each in found)
        return [*map(_Plain, given)] == [*map(_Plain, expected)], expected, given

    def _References(self, case: Case) -> tuple[bool, object, object]:
        expected = ExpectedPlaces(case.expected, self._module, case.line + 1)
        found = Answer(self._engine.References(self._Place(case)))
        given = {GivenPlace(each, self._folder) for each in found}
        return SamePlaces(expected, given), map(_Numbered, expected), map(_Numbered, given)


def _Plain(text: str) -> str:
    return re.sub(r"\s+", "", text).rstrip(";:")


def _Numbered(place: tuple[str, int | None, int]) -> str:
    return ":".join(map(str, place))


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("jedi", help="jedi's test/completion", description=f"{__doc__}\n{HOW_TO_GET}.")
    parser.add_argument("folder", type=Path, help=HOW_TO_GET)
    parser.add_argument("--version", default="3.13", help="the Python that the cases are read for (3.13)")
    parser.add_argument("--only", help="the files whose name holds this")
    AddHalf(parser)
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    folder = options.folder.resolve()
    if (folder / "completion").is_dir():
        folder = folder / "completion"
    version = tuple(map(int, options.version.split(".")))
    targets = {"references": 90.0, "types": 85.0, "completions": 85.0}
    tally = Tally("Types, completions, definitions and references (jedi's tests)", targets, failures=options.failures)
    engine = ENGINES[options.engine]([folder], None, version)
    for path in sorted(folder.glob("*.py")):
        if options.only and options.only not in path.name:
            continue
        questions = Questions(folder, path, engine)
        for case in ParseCases(path.name, Cut(ReadText(path)), options.half):
            if not IsFor(case, version):
                tally.Note("cases for other versions of Python")
                continue
            right, expected, given = questions.Ask(case)
            tally.Add(case.kind, f"{path.name}:{case.line}", right, expected, given)
    return tally.Report()
