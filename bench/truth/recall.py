"""Uses of methods whose name is defined once in a project: how many of them the references of the method have.

Every attribute of the name is taken for a use, which is an upper bound: some may be of another class outside of the
project. Names that builtin types have are left out. A server can be asked where the uses that are called certain are
defined; those that it places elsewhere are counted.
"""

from __future__ import annotations

import argparse
import random
from collections import defaultdict
from pathlib import Path

from bench.truth.engine import ENGINES, AddEngine
from bench.truth.peers import AddPeers, Start
from bench.truth.places import Place
from bench.truth.projects import HOW_TO_GET, PLAIN, Name, Names, SourceFiles
from bench.truth.tally import AddFailures, Tally

_BUILTIN = {name for kind in (str, bytes, list, dict, set, tuple, int, float, complex, object) for name in dir(kind)}


class Method:
    """A method that is the only one of its name, and every attribute of this name."""

    def __init__(self, definition: Name, uses: list[Name]) -> None:
        self.definition = definition
        self.uses = uses


def MethodsDefinedOnce(folder: Path) -> list[Method]:
    """Those that have a use, in the order of their places."""
    bound: dict[str, list[Name]] = defaultdict(list)
    uses: dict[str, list[Name]] = defaultdict(list)
    for path in SourceFiles(folder):
        for name in Names(path):
            if name.role in ("definition", "write", "import") and (name.group != PLAIN or name.scope_kind == "class"):
                bound[name.text].append(name)
            elif name.group != PLAIN and name.role in ("read", "call"):
                uses[name.text].append(name)
    return [
        Method(found[0], uses[text])
        for text, found in sorted(bound.items())
        if len(found) == 1 and found[0].kind == "function" and uses[text] and text not in _BUILTIN
    ]


def AddTo(commands: argparse._SubParsersAction[argparse.ArgumentParser]) -> None:
    parser = commands.add_parser("recall", help="how many uses references find", description=__doc__)
    parser.add_argument("projects", type=Path, nargs="+", metavar="FOLDER", help=f"projects: {HOW_TO_GET}")
    parser.add_argument("--methods", type=int, default=40, help="methods of each project (40)")
    parser.add_argument("--seed", type=int, default=1)
    AddPeers(parser, "basedpyright")
    AddEngine(parser)
    AddFailures(parser)
    parser.set_defaults(run=Run)


def Run(options: argparse.Namespace) -> int:
    status = 0
    for project in options.projects:
        folder = project.resolve()
        methods = MethodsDefinedOnce(folder)
        methods = random.Random(options.seed).sample(methods, min(options.methods, len(methods)))
        tally = Tally(f"Uses of methods in {folder.name}", {"uses": 95.0}, failures=options.failures)
        tally.Note("methods", len(methods))
        engine = ENGINES[options.engine]([folder])
        certain: dict[Place, Name] = {}
        for method in methods:
            found = {each.place: each for each in engine.References(method.definition.place)}
            for use in method.uses:
                key = f"{method.definition.text}, used at {Path(use.place.path).relative_to(folder)}:{use.place.line}"
                tally.Add("uses", key, use.place in found, use.text)
                if use.place in found:
                    tally.Note(f"found as {found[use.place].certainty}")
                    if found[use.place].certainty == "certain":
                        certain[use.place] = method.definition
            places = {use.place for use in method.uses} | {method.definition.place}
            for place, each in found.items():
                if place not in places:
                    line = Path(place.path).read_text(errors="replace").splitlines()[place.line - 1]
                    is_named = method.definition.text in line
                    what = "references that are no attribute" if is_named else "references that do not have the name"
                    tally.Fault(what, f"{method.definition.text} {each}", line, most=None if is_named else 0)
        for peer in options.peers:
            _CheckCertain(tally, peer, folder, certain)
        status |= tally.Report()
    return status


def _CheckCertain(tally: Tally, peer: str, folder: Path, certain: dict[Place, Name]) -> None:
    """Counts those that the server places elsewhere."""
    with Start(peer, folder) as server:
        path = ""
        for place, definition in sorted(certain.items()):
            if place.path != path:
                if path:
                    server.Close(path)
                path = place.path
                server.Open(path)
            found = server.Definitions(place)
            if found and all(each.place[:2] != definition.place[:2] for each in found):
                what = f"certain ones that {peer} places elsewhere"
                tally.Fault(what, f"{definition.text} at {place}", map(str, found))
            tally.Note(f"certain ones that {peer} {'places' if found else 'does not place'}")
