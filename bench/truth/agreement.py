"""Definitions of random names of real projects, held against those that language servers give.

A name counts where both answer. They agree where the best place of the workspace's answer is one that the server names
as well. A place outside the project (typeshed's stubs, which each carries a copy of) is compared by its module and by
the name that stands there. What is called certain and is none of the server's places is counted apart.

Where two servers are asked, names that both answer are counted once more: those on which the two agree, and of the
others with which of them the workspace is. No answer agrees with both where they have no place in common, so the
rest of a table is to be read against what they leave room for.

Where a server does not know an attribute it may name the function of the call around it. So of its places for an
attribute those count that are of a module or have the attribute's name.

The answers of servers can be kept in a folder, so that another run of the same names need not ask them again.
"""

from __future__ import annotations

import argparse
import hashlib
import json
from pathlib import Path

from bench.truth.engine import ENGINES, AddEngine, Answer
from bench.truth.peers import AddPeers, Start
from bench.truth.places import Found, Texts
from bench.truth.projects import HOW_TO_GET, OTHER, OWN, PLAIN, Name, SampleNames
from bench.truth.tally import AddFailures, Tally

_TARGETS = {PLAIN: 99.0, OWN: 97.0, OTHER: 90.0}


class Identity:
    """What tells one place of an answer from another, and whether one is of a name at all."""

    def __init__(self, folder: Path) -> None:
        self._folder = folder
        self._texts = Texts()

    def IsOf(self, found: Found, name: Name) -> bool:
        is_named = name.text in self._texts.Line(found.path, found.line)[found.column : found.end]
        return name.group == PLAIN or is_named or (found.line, found.column) == (1, 0)

    def Of(self, found: Found) -> str:
        path = Path(found.path)
        if path.is_relative_to(self._folder):
            return f"{path.relative_to(self._folder).as_posix()}:{found.line}"
        stem = path.parent.name if path.stem == "__init__" else path.stem
        line = self._texts.Line(found.path, found.line)
        is_module = (found.line, found.column) == (1, 0)
        return f"{stem}: {'module' if is_module else line[found.column : found.end]}"


def PeerAnswers(peer: str, folder: Path, names: list[Name], keep: Path | None) -> list[list[Found]]:
    """What a server says to each name; asked, or as it was kept."""
    places = json.dumps([name.place for name in names])
    kept = None
    if keep is not None:
        keep.mkdir(parents=True, exist_ok=True)
        kept = keep / f"{peer}-{folder.name}-{hashlib.sha256(places.encode()).hexdigest()[:12]}.json"
        if kept.exists():
            return [[Found(*each) for each in answer] for answer in json.loads(kept.read_text())]
    answers: list[list[Found]] = []
    with Start(peer, folder) as server:
        path = ""
        for name in names:
            if name.place.path != path:
                if path:
                    server.Close(path)
                path = name.place.path
                server.Open(path)
            answers.append(server.Definitions(name.place))
    if kept is not None:
        kept.write_text(json.dumps(answers))
    return answers


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("agreement", help="definitions as servers give them", description=__doc__)
    parser.add_argument("projects", type=Path, nargs="+", metavar="FOLDER", help=f"projects: {HOW_TO_GET}")
    parser.add_argument("--count", type=int, default=2000, help="names of each project (2000)")
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--answers", type=Path, metavar="FOLDER", help="where answers of servers are kept")
    AddPeers(parser, "ty,basedpyright")
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def HoldAgainstBoth(
    title: str, names: list[Name], own: list[set[str]], peers: dict[str, list[set[str]]], failures: bool
) -> None:
    """Counts where two servers agree with each other, and what the workspace says there; of the rest, whose side it
    takes. Each list has what identifies the places of an answer: the best one of the workspace's.
    """
    (first, firsts), (second, seconds) = peers.items()
    tally = Tally(f"{title}, held against {first} and {second} where both answer", failures=failures)
    for name, best, one, other in zip(names, own, firsts, seconds, strict=True):
        if not (best and one and other):
            continue
        key = f"{name.place.path}:{name.place.line}:{name.place.column} {name.text}"
        if one & other:
            tally.Add(f"{name.group} on which they agree", key, bool(best & one & other), one & other, best)
            continue
        sides = [peer for peer, answer in ((first, one), (second, other)) if best & answer]
        tally.Note(f"{name.group} on which they do not")
        tally.Note(f"{name.group} on which they do not, {' '.join(sides) or 'neither'} with the workspace")
    tally.Report()


def Run(options: argparse.Namespace) -> int:
    status = 0
    for project in options.projects:
        folder = project.resolve()
        names = SampleNames(folder, options.count, options.seed)
        engine = ENGINES[options.engine]([folder])
        given = [engine.Definitions(name.place) for name in names]
        identity = Identity(folder)
        best = [{identity.Of(Answer(own)[0])} if own else set() for own in given]
        by_peer: dict[str, list[set[str]]] = {}
        for peer in options.peers:
            answers = PeerAnswers(peer, folder, names, options.answers)
            tally = Tally(f"Definitions in {folder.name}, held against {peer}", _TARGETS, failures=options.failures)
            by_peer[peer] = []
            for name, own, answer in zip(names, given, answers, strict=True):
                other = [each for each in answer if identity.IsOf(each, name)]
                expected = {identity.Of(each) for each in other}
                by_peer[peer].append(expected)
                shown = [f"{identity.Of(each)} ({each.certainty})" for each in own]
                key = f"{Path(name.place.path).relative_to(folder)}:{name.place.line}:{name.place.column} {name.text}"
                if own and other:
                    agree = identity.Of(Answer(own)[0]) in expected
                    tally.Add(name.group, key, agree, expected, shown)
                    if any(each.certainty == "certain" and identity.Of(each) not in expected for each in own):
                        what = f"{name.group}, called certain, and none of {peer}'s"
                        tally.Fault(what, key, [*shown, f"expected {sorted(expected)}"], most=None)
                elif other:
                    tally.Fault(f"{name.group} that only {peer} answers", key, expected, most=None)
                elif own:
                    tally.Note(f"{name.group} that only {engine.name} answers")
                else:
                    tally.Note(f"{name.group} that neither answers")
            status |= tally.Report()
        if len(by_peer) == 2:
            HoldAgainstBoth(f"Definitions in {folder.name}", names, best, by_peer, options.failures)
    return status
