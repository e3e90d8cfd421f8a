"""Renames of random symbols of a real project.

For each symbol: what is written by the edits compiles, and the edits are just the references that are certain, and
those of what has to keep one name with it: a method that overrides it or is overridden, or what a reference means as
well. Of such an edit all that is certain has to be edited, too, and how many there are is told. All renames can also be
done one after the other in a copy of the project, whose own tests then have to pass (`--tests`).
"""

from __future__ import annotations

import argparse
import random
import shlex
import shutil
import subprocess
import tempfile
import warnings
from collections import defaultdict
from collections.abc import Iterable
from pathlib import Path

from bench.truth.engine import ENGINES, AddEngine, Engine
from bench.truth.places import Change, Place, ReadText
from bench.truth.projects import HOW_TO_GET, Name, Names, SourceFiles
from bench.truth.tally import AddFailures, Tally

# What is written behind a name to make the new one: found nowhere else.
SUFFIX = "_renamed_here"


def Apply(changes: Iterable[Change]) -> dict[str, str]:
    """The texts of the files that are changed."""
    by_file: dict[str, list[Change]] = defaultdict(list)
    for change in changes:
        by_file[change.path].append(change)
    texts = {}
    for path, edits in by_file.items():
        lines = ReadText(path).splitlines(keepends=True)
        for edit in sorted(set(edits), reverse=True):
            line = lines[edit.line - 1]
            lines[edit.line - 1] = line[: edit.column] + edit.text + line[edit.end :]
        texts[path] = "".join(lines)
    return texts


def Compiles(text: str) -> str | None:
    """What is wrong with a source; None where nothing is."""
    try:
        with warnings.catch_warnings():
            warnings.simplefilter("ignore")
            compile(text, "renamed", "exec", dont_inherit=True)
    except (SyntaxError, ValueError) as error:
        return str(error)
    return None


def Symbols(folder: Path, count: int, seed: int) -> list[Name]:
    """Random definitions: classes, functions, parameters and variables, by how many there are of each."""
    found = [
        name
        for path in SourceFiles(folder)
        if Compiles(ReadText(path)) is None
        for name in Names(path)
        if name.role in ("definition", "write")
        and name.kind in ("class", "function", "parameter", "variable")
        and not (name.text.startswith("__") and name.text.endswith("__"))
        and name.text not in ("_", "self", "cls")
    ]
    return random.Random(seed).sample(found, min(count, len(found)))


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("rename", help="renames of a project's symbols", description=__doc__)
    parser.add_argument("project", type=Path, metavar="FOLDER", help=f"a project: {HOW_TO_GET}")
    parser.add_argument("--count", type=int, default=200, help="symbols (200)")
    parser.add_argument(
        "--tests", metavar="COMMAND", help="what runs the project's tests, in a copy with all renames done"
    )
    parser.add_argument("--seed", type=int, default=1)
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    folder = options.project.resolve()
    targets = {"the result compiles": 100.0, "just the certain references": 100.0}
    tally = Tally(f"Renames in {folder.name}", targets, failures=options.failures)
    engine = ENGINES[options.engine]([folder])
    for symbol in Symbols(folder, options.count, options.seed):
        _Check(tally, engine, folder, symbol)
    if options.tests:
        tally.Note("tests of the copy with all renames that failed", _Tested(options, folder, tally), most=0)
    return tally.Report()


def _Check(tally: Tally, engine: Engine, folder: Path, symbol: Name) -> None:
    key = f"{Path(symbol.place.path).relative_to(folder)}:{symbol.place.line}:{symbol.place.column} {symbol.text}"
    changes = engine.Rename(symbol.place, symbol.text + SUFFIX)
    if changes is None:
        tally.Fault("refused", key, most=None)
        return
    tally.Note("edits", len(changes))
    problems = [f"{path}: {problem}" for path, text in Apply(changes).items() if (problem := Compiles(text))]
    tally.Add("the result compiles", key, not problems, "", problems)
    edited = {Place(each.path, each.line, each.column) for each in changes}
    references = _Certain(engine, symbol.place)
    missing = [f"not {place}" for place in references - edited]
    # What goes along has references of its own, none of which is left.
    more = edited - references
    tally.Note("edits of what goes along, such as overrides", len(more))
    while more:
        place = min(more)
        its = _Certain(engine, place)
        missing += [f"not {other}, of {place}" for other in its - edited]
        missing += [f"also {place}"] if place not in its else []
        more -= its | {place}
    tally.Add("just the certain references", key, not missing, "", missing)
    wrong = [each for each in changes if _Old(each) != symbol.text]
    if wrong:
        tally.Fault("edits of what is another name", key, wrong)


def _Certain(engine: Engine, place: Place) -> set[Place]:
    return {each.place for each in engine.References(place) if each.certainty == "certain"}


def _Old(change: Change) -> str:
    return ReadText(change.path).splitlines()[change.line - 1][change.column : change.end]


def _Tested(options: argparse.Namespace, folder: Path, tally: Tally) -> int:
    """Does the renames in a copy, one after the other, and runs its tests. 1 where those fail."""
    with tempfile.TemporaryDirectory() as name:
        copy = Path(name).resolve() / folder.name
        shutil.copytree(folder, copy, ignore=shutil.ignore_patterns(".git"))
        command = shlex.split(options.tests)
        if subprocess.run(command, cwd=copy, capture_output=True, check=False).returncode:
            raise SystemExit(f"the tests fail before anything is renamed: {options.tests}")
        for round_ in range(options.count):
            symbols = Symbols(copy, 1, options.seed + round_)
            engine = ENGINES[options.engine]([copy])
            for symbol in symbols:
                changes = engine.Rename(symbol.place, symbol.text + SUFFIX)
                for path, text in Apply(changes or ()).items():
                    Path(path).write_text(text)
                tally.Note("renames in the copy", int(bool(changes)))
        done = subprocess.run(command, cwd=copy, capture_output=True, text=True, check=False)
        if done.returncode:
            tally.Fault("tests", options.tests, done.stdout[-2000:], most=None)
        return int(done.returncode != 0)
