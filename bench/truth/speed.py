"""What answers cost in a real project: the workspace, and language servers beside it, in one table.

Each is started afresh with nothing prepared, is held to one core (`--all-cores`: not), and is asked one question at a
time. First answers are counted from the start of the process, for the workspace that of Python included. Warm ones are
asked in files where other names have been asked before, and are counted in milliseconds of the processor, which other
work on the machine changes little: of the workspace those of the call, of a server those that it had spent when its
answer came. A keystroke puts a letter into a buffer of about 2,600 lines and asks for its problems and
its outline; a server that does not let itself be asked for problems is asked for the outline alone, which is marked.
"""

from __future__ import annotations

import argparse
import json
import os
import random
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
from collections import Counter
from collections.abc import Callable, Sequence
from pathlib import Path
from typing import NamedTuple, Protocol

from bench.truth.engine import ByteColumn
from bench.truth.lsp import LanguageServer, Refused, ServerError, Usage
from bench.truth.peers import AddPeers, Start
from bench.truth.places import Cut, Place, ReadText
from bench.truth.projects import HOW_TO_GET, OTHER, OWN, PLAIN, Name, Names, SourceFiles

OWN_NAME = "quillet"


class Subject(Protocol):
    """What is measured. Each question gives the seconds of the processor that it took, and how many results it had."""

    usage: Usage

    def Open(self, path: str) -> None: ...

    def Definitions(self, place: Place) -> tuple[float, int]: ...

    def References(self, place: Place) -> tuple[float, int]: ...

    def Complete(self, place: Place) -> tuple[float, int]: ...

    def Keystroke(self, place: Place) -> tuple[float, int]:
        """Puts a letter there, and asks for problems and outline. 1: both were given."""

    def Stop(self) -> None: ...


class OwnProcess:
    """quillet.Workspace in a process of its own."""

    def __init__(self, folder: Path, *, one_core: bool) -> None:
        core = ["taskset", "-c", str(min(os.sched_getaffinity(0)))] if one_core else []
        self._process = subprocess.Popen(
            [*core, sys.executable, "-m", "bench.truth.own_process", str(folder)],
            stdin=subprocess.PIPE,
            stdout=subprocess.PIPE,
            text=True,
            start_new_session=True,
        )
        self.usage = Usage(self._process.pid)

    def _Ask(self, *calls: Sequence[object]) -> tuple[float, int]:
        assert self._process.stdin is not None
        assert self._process.stdout is not None
        self._process.stdin.write(json.dumps(calls) + "\n")
        self._process.stdin.flush()
        line = self._process.stdout.readline()
        if not line:
            raise SystemExit("the workspace's process has ended")
        seconds, counts = json.loads(line)
        return seconds, counts[-1]

    @staticmethod
    def _At(place: Place) -> tuple[str, int, int]:
        line = Cut(ReadText(place.path))[place.line - 1]
        return place.path, place.line, ByteColumn(line, place.column)

    def Open(self, path: str) -> None:
        self._Ask(("open", path, ReadText(path)))

    def Definitions(self, place: Place) -> tuple[float, int]:
        return self._Ask(("definitions", *self._At(place)))

    def References(self, place: Place) -> tuple[float, int]:
        return self._Ask(("references", *self._At(place)))

    def Complete(self, place: Place) -> tuple[float, int]:
        return self._Ask(("complete", *self._At(place)))

    def Keystroke(self, place: Place) -> tuple[float, int]:
        path, line, column = self._At(place)
        edit = (path, line, column, column, "q")
        seconds, _ = self._Ask(("change", path, [edit]), ("problems", path), ("outline", path))
        return seconds, 1

    def Stop(self) -> None:
        assert self._process.stdin is not None
        self.usage.Look()
        self._process.stdin.close()
        self._process.wait()


class Server:
    """A language server."""

    def __init__(self, name: str, folder: Path, *, one_core: bool) -> None:
        self._server: LanguageServer = Start(name, folder, one_core=one_core)
        self.usage = self._server.usage
        self._gives_problems = True

    def _Spent(self) -> float:
        self.usage.LookAtTime()
        return self.usage.seconds

    def _Timed(self, question: Callable[[], Sequence[object]]) -> tuple[float, int]:
        start = self._Spent()
        count = len(question())
        return self._Spent() - start, count

    def Open(self, path: str) -> None:
        self._server.Open(path)

    def Definitions(self, place: Place) -> tuple[float, int]:
        return self._Timed(lambda: self._server.Definitions(place))

    def References(self, place: Place) -> tuple[float, int]:
        return self._Timed(lambda: self._server.References(place))

    def Complete(self, place: Place) -> tuple[float, int]:
        return self._Timed(lambda: self._server.Complete(place))

    def Keystroke(self, place: Place) -> tuple[float, int]:
        start = self._Spent()
        self._server.Type(place.path, place, "q")
        if self._gives_problems:
            try:
                self._server.Problems(place.path)
            except Refused:
                self._gives_problems = False
        self._server.Outline(place.path)
        return self._Spent() - start, int(self._gives_problems)

    def Stop(self) -> None:
        self._server.Stop()


class Questions(NamedTuple):
    """What each subject is asked."""

    symbol: Place
    use: Place
    before: list[Place]
    definitions: list[Place]
    completions: list[Place]
    references: list[Place]
    keystroke: Place


def Choose(folder: Path, symbol: str | None, seed: int, within: str = "") -> Questions:
    """The questions of a project, or of a folder `within` it: of copies side by side all are asked of one, as in all of
    them no name is defined once. Without `symbol` (FILE:NAME), the function that most is asked of."""
    pick = random.Random(seed)
    files = SourceFiles(folder / within)
    names = {path: list(Names(path)) for path in files}
    defined: Counter[str] = Counter()
    used: Counter[str] = Counter()
    functions: dict[str, Name] = {}
    for found in names.values():
        for name in found:
            if name.role in ("definition", "write") and name.scope_kind != "function":
                defined[name.text] += 1
                if name.kind == "function" and name.scope_kind == "module":
                    functions[name.text] = name
            elif name.role in ("read", "call") and name.group == PLAIN:
                used[name.text] += 1
    once = sorted((name for name in functions if defined[name] == 1), key=lambda name: -used[name])
    if symbol is None:
        definition = functions[once[0]]
    else:
        file, _, text = symbol.rpartition(":")
        definition = next(each for each in names[folder / file] if each.text == text and each.role == "definition")
    use = next(
        each
        for path in pick.sample(files, len(files))
        if str(path) != definition.place.path
        for each in names[path]
        if each.text == definition.text and each.role == "call" and each.group == PLAIN
    )
    large = [path for path in files if sum(name.role in ("read", "call") for name in names[path]) > 60]
    before, definitions, completions = [], [], []
    for path in pick.sample(large, min(20, len(large))):
        asked = pick.sample([name for name in names[path] if name.role in ("read", "call")], 20)
        before += [name.place for name in asked[:10]]
        definitions += [name.place for name in asked[10:]]
        dotted = [name.place for name in names[path] if name.group in (OWN, OTHER)]
        completions += pick.sample(dotted, min(10, len(dotted)))
    others = [functions[name].place for name in once[:40] if functions[name].place != definition.place]
    big = min(files, key=lambda path: abs(len(Cut(ReadText(path))) - 2600))
    inside = [
        name for name in names[big] if name.role == "read" and name.group == PLAIN and name.scope_kind == "function"
    ]
    return Questions(
        definition.place,
        use.place,
        before,
        definitions,
        completions,
        pick.sample(others, 10),
        pick.choice(inside).place,
    )


def Measure(start: Callable[[], Subject], draws: Sequence[Questions]) -> dict[str, str]:
    """A row of the table. A first answer gets a process of its own, and so do the warm ones of each draw."""
    row: dict[str, str] = {}
    warm = Warm()
    try:
        first = _First(start, draws[0].use, definition=True)
        row["first definition"] = f"{first.wall:.2f} s ({first.found})"
        row["the definition's processor"] = f"{first.processor:.2f} s"
        row["the definition's memory"] = f"{first.mebibytes:.0f} MiB"
        for number, questions in enumerate(draws):
            first = _First(start, questions.symbol, then=lambda subject: warm.Ask(subject, questions))  # noqa: B023
            if number == 0:
                row["first references"] = f"{first.wall:.2f} s ({first.found})"
                row["its processor"] = f"{first.processor:.2f} s"
                row["memory"] = f"{first.mebibytes:.0f} MiB"
    except ServerError as error:
        row["failure"] = str(error)
    return {**row, **warm.Row()}


class First(NamedTuple):
    """The first answer of a process: seconds by the clock and of the processor, results, and memory by then."""

    wall: float
    processor: float
    found: int
    mebibytes: float


def _First(
    start: Callable[[], Subject],
    place: Place,
    *,
    definition: bool = False,
    then: Callable[[Subject], None] | None = None,
) -> First:
    begin = time.perf_counter()
    subject = start()
    try:
        subject.Open(place.path)
        _, count = (subject.Definitions if definition else subject.References)(place)
        wall = time.perf_counter() - begin
        usage = subject.usage.Look()
        first = First(wall, usage.seconds, count, usage.peak_kib / 1024)
        if then is not None:
            then(subject)
        return first
    finally:
        subject.Stop()


class Warm:
    """What processes that have answered before take for further questions, of all draws together."""

    def __init__(self) -> None:
        self.seconds: dict[str, list[float]] = {}
        self.outline_only = False

    def Ask(self, subject: Subject, questions: Questions) -> None:
        for path in sorted({place.path for place in questions.before}):
            subject.Open(path)
        for place in questions.before:
            subject.Definitions(place)
        self._Add("definitions", [subject.Definitions(place)[0] for place in questions.definitions])
        for place in questions.completions[::10]:
            subject.Complete(place)
        self._Add("completions", [subject.Complete(place)[0] for place in questions.completions])
        self._Add("references", [subject.References(place)[0] for place in questions.references])
        if questions.keystroke.path not in {place.path for place in questions.before}:
            subject.Open(questions.keystroke.path)
        strokes = [subject.Keystroke(questions.keystroke) for _ in range(21)][1:]
        self.outline_only |= not all(given for _, given in strokes)
        self._Add("keystroke", [seconds for seconds, _ in strokes])

    def _Add(self, what: str, seconds: list[float]) -> None:
        self.seconds.setdefault(what, []).extend(seconds)

    def Row(self) -> dict[str, str]:
        row = {what: _Spread(seconds) for what, seconds in self.seconds.items()}
        if self.outline_only:
            row["keystroke"] += " (outline only)"
        return row


def _Spread(seconds: list[float]) -> str:
    """The median and the 99th percentile."""
    ordered = sorted(seconds)
    high = ordered[min(len(ordered) - 1, round(0.99 * len(ordered)))]
    return f"{statistics.median(ordered) * 1000:.1f} / {high * 1000:.1f} ms"


def Copies(project: Path, count: int, into: Path) -> str:
    """Puts renamed copies of a project's package side by side: `sympy` becomes `sympy1`, `sympy2` and so on. Gives the
    name of the first."""
    package = max((path.parent for path in project.glob("*/__init__.py")), key=lambda path: len(SourceFiles(path)))
    word = re.compile(rf"\b{re.escape(package.name)}\b")
    for number in range(1, count + 1):
        name = f"{package.name}{number}"
        shutil.copytree(package, into / name)
        for path in SourceFiles(into / name):
            text = path.read_bytes().decode("utf-8", "surrogateescape")
            path.write_bytes(word.sub(name, text).encode("utf-8", "surrogateescape"))
    return f"{package.name}1"


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("speed", help="what answers cost", description=__doc__)
    parser.add_argument("--project", type=Path, required=True, metavar="FOLDER", help=f"a project: {HOW_TO_GET}")
    parser.add_argument("--symbol", metavar="FILE:NAME", help="whose references are asked; of copies that of the first")
    parser.add_argument("--copies", type=int, default=0, help="ask in so many renamed copies of the project's package")
    parser.add_argument("--index", action="store_true", help="with an index in the folder of the copies")
    parser.add_argument("--all-cores", action="store_true")
    parser.add_argument("--without", action="store_true", help="measure the servers alone")
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--draws", type=int, default=1, help="ask so many draws of warm questions, from the seed on")
    AddPeers(parser, "ty,basedpyright,pyrefly,zuban,jedi")
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    with tempfile.TemporaryDirectory() as name:
        folder, within = options.project.resolve(), ""
        if options.copies:
            within = Copies(folder, options.copies, Path(name))
            folder = Path(name).resolve()
            if options.index:
                time.sleep(2.5)  # a file that was written just now is not known by its time
                subprocess.run([sys.executable, "-m", "quillet", "index", ".", "--quiet"], cwd=folder, check=True)
        lines = sum(len(Cut(ReadText(path))) for path in SourceFiles(folder))
        seeds = range(options.seed, options.seed + options.draws)
        draws = [Choose(folder, options.symbol, seed, within) for seed in seeds]
        asked = draws[0].symbol
        symbol = Path(asked.path).relative_to(folder)
        print(f"{options.project.name}, {lines:,} lines; the symbol is at {symbol}:{asked.line}", flush=True)
        one_core = not options.all_cores
        subjects: dict[str, Callable[[], Subject]] = {}
        if not options.without:
            subjects[OWN_NAME] = lambda: OwnProcess(folder, one_core=one_core)
        for peer in options.peers:
            subjects[peer] = lambda peer=peer: Server(peer, folder, one_core=one_core)  # type: ignore[misc]
        rows = {}
        for subject, start in subjects.items():
            rows[subject] = Measure(start, draws)
            print(f"{subject}: {rows[subject]}", flush=True)
    heads = list(dict.fromkeys(head for row in rows.values() for head in row))
    print(f"\n| | {' | '.join(rows)} |\n| --- |{' ---: |' * len(rows)}")
    for head in heads:
        print(f"| {head} | {' | '.join(row.get(head, '') for row in rows.values())} |")
    return 0
