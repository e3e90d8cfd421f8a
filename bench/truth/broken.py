"""Definitions in sources that are being typed: a token is deleted, or the file is cut behind one.

In each of many random places of a project's files, names elsewhere in the file are asked for their definitions before
and after. They should stay the same, moved as the text moved. Not asked are names in the statement that is broken,
names whose definition is in it, and, of a file that is cut, what stands or is defined behind the cut.
"""

from __future__ import annotations

import argparse
import io
import random
import tokenize
from collections.abc import Iterator
from pathlib import Path
from typing import NamedTuple

from bench.truth.engine import ENGINES, AddEngine, Engine
from bench.truth.places import Cut, Found, Place, ReadText
from bench.truth.projects import HOW_TO_GET, Name, Names, SourceFiles
from bench.truth.tally import AddFailures, Tally

_BLANK = (tokenize.NEWLINE, tokenize.NL, tokenize.INDENT, tokenize.DEDENT, tokenize.COMMENT, tokenize.ENDMARKER)
Position = tuple[int, int]


class Token(NamedTuple):
    """A token, and the lines of its statement."""

    text: str
    begin: Position
    end: Position
    first: int
    last: int


def Tokens(text: str) -> list[Token]:
    """Those of a file that say something; none where Python's own tokenizer ends early."""
    found: list[Token] = []
    statement: list[tokenize.TokenInfo] = []
    try:
        for token in tokenize.generate_tokens(io.StringIO(text).readline):
            if token.type not in _BLANK:
                statement.append(token)
            elif token.type == tokenize.NEWLINE and statement:
                first, last = statement[0].start[0], statement[-1].end[0]
                found += [Token(each.string, each.start, each.end, first, last) for each in statement]
                statement.clear()
    except (tokenize.TokenError, SyntaxError):
        return []
    return found


class Break(NamedTuple):
    """A file that was broken: its text, the statement's lines, and how much was taken out from where."""

    text: str
    token: Token
    is_cut: bool

    def Moved(self, line: int, column: int) -> Position | None:
        """Where a place of the whole file is now; None where it is gone or in the statement that is broken."""
        if self.is_cut:
            return (line, column) if line < self.token.first else None
        if self.token.first <= line <= self.token.last:
            return None
        taken = self.token.end[0] - self.token.begin[0]
        return (line - taken if line > self.token.last else line), column


def Delete(text: str, token: Token) -> Break:
    lines = Cut(text)
    begin, end = token.begin, token.end
    joined = lines[begin[0] - 1][: begin[1]] + lines[end[0] - 1][end[1] :]
    return Break("\n".join([*lines[: begin[0] - 1], joined, *lines[end[0] :]]), token, False)


def CutBehind(text: str, token: Token) -> Break:
    lines = Cut(text)
    return Break("\n".join([*lines[: token.end[0] - 1], lines[token.end[0] - 1][: token.end[1]]]), token, True)


def Expected(before: list[Found], broken: Break, path: str) -> set[Place] | None:
    """The places of an answer in the broken file; None where one of them is gone."""
    places = set()
    for each in before:
        if each.path != path:
            places.add(each.place)
        elif moved := broken.Moved(each.line, each.column):
            places.add(Place(path, *moved))
        else:
            return None
    return places


def Breaks(files: list[Path], count: int, pick: random.Random) -> Iterator[tuple[Path, Break]]:
    """Random ones, deleting and cutting in turn."""
    done = 0
    while done < count:
        path = pick.choice(files)
        text = ReadText(path)
        tokens = Tokens(text)
        if len(tokens) > 100:
            token = pick.choice(tokens)
            yield path, (CutBehind if done % 2 else Delete)(text, token)
            done += 1


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("broken", help="definitions in broken sources", description=__doc__)
    parser.add_argument("projects", type=Path, nargs="+", metavar="FOLDER", help=f"projects: {HOW_TO_GET}")
    parser.add_argument("--count", type=int, default=1000, help="places of each project that are broken (1000)")
    parser.add_argument("--names", type=int, default=10, help="names that are asked in each (10)")
    parser.add_argument("--seed", type=int, default=1)
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    status = 0
    for project in options.projects:
        folder = project.resolve()
        pick = random.Random(options.seed)
        files = SourceFiles(folder)
        engine = ENGINES[options.engine]([folder])
        tally = Tally(f"Definitions in broken files of {folder.name}", {"all": 99.0}, failures=options.failures)
        for path, broken in Breaks(files, options.count, pick):
            names = [name for name in Names(path) if name.role in ("read", "call")]
            names = [name for name in names if broken.Moved(*name.place[1:])]
            names = pick.sample(names, min(options.names, len(names)))
            _Compare(tally, engine, path, broken, names)
            tally.Note("files broken")
        status |= tally.Report()
    return status


def _Compare(tally: Tally, engine: Engine, path: Path, broken: Break, names: list[Name]) -> None:
    before = [engine.Definitions(name.place) for name in names]
    engine.Open(str(path), broken.text)
    group = "cut behind a token" if broken.is_cut else "a token deleted"
    what = f"{'cut behind' if broken.is_cut else 'without'} {broken.token.text!r} at line {broken.token.begin[0]}"
    for name, was in zip(names, before, strict=True):
        expected = Expected(was, broken, str(path))
        moved = broken.Moved(*name.place[1:])
        if expected is not None and moved is not None:
            given = {each.place for each in engine.Definitions(Place(str(path), *moved))}
            key = f"{path}: {what}: {name.text} at {name.place.line}:{name.place.column}"
            tally.Add(group, key, given == expected, map(str, expected), map(str, given))
    engine.Close(str(path))
