"""The engines that a truth set can be asked of: quillet's workspace, and others to see that a runner asks rightly.

Only here do the runners meet an engine's own ways: where its lines and columns begin, what it raises, how it is told of
buffers.
"""

from __future__ import annotations

import argparse
from collections.abc import Callable, Iterable, Sequence
from pathlib import Path
from typing import Any, Protocol

from bench.truth.peers import COMMANDS, Start
from bench.truth.places import Call, Change, Found, Place, Texts

STRONG = ("certain", "likely")


class Engine(Protocol):
    """What the runners ask. Lines count from 1, columns from 0, in characters."""

    name: str

    def Definitions(self, place: Place) -> list[Found]: ...

    def References(self, place: Place) -> list[Found]: ...

    def Types(self, place: Place) -> list[str]: ...

    def TypesBefore(self, cursor: Place) -> list[str]:
        """The types of the expression that ends at the cursor, or of the name that it is in."""

    def Complete(self, place: Place) -> list[str]: ...

    def Rename(self, place: Place, new_name: str) -> list[Change] | None:
        """None where it is refused."""

    def Callers(self, place: Place) -> list[Call]: ...

    def Callees(self, place: Place) -> list[Call]: ...

    def Open(self, path: str, text: str) -> None: ...

    def Close(self, path: str) -> None: ...


class QuilletEngine:
    """quillet.Workspace. Its columns count from 1, in bytes of UTF-8."""

    name = "quillet"

    def __init__(
        self, roots: Sequence[str | Path], environment: str | Path | None = None, version: tuple[int, ...] | None = None
    ) -> None:
        import quillet

        given = None if environment is None else str(environment)
        self.workspace: Any = quillet.Workspace(*map(str, roots), environment=given, version=version)
        self._texts = Texts()

    def Definitions(self, place: Place) -> list[Found]:
        return self._Found(self.workspace.definitions(*self._Asked(place)))

    def References(self, place: Place) -> list[Found]:
        return self._Found(self.workspace.references(*self._Asked(place)))

    def Types(self, place: Place) -> list[str]:
        return list(self.workspace.types(*self._Asked(place)))

    TypesBefore = Types  # a place is that of what it touches

    def Complete(self, place: Place) -> list[str]:
        return [completion.name for completion in self.workspace.complete(*self._Asked(place))]

    def Rename(self, place: Place, new_name: str) -> list[Change] | None:
        try:
            edits = self.workspace.rename(*self._Asked(place), new_name)
        except ValueError:
            return None
        changes = []
        for edit in edits:
            line = self._texts.Line(edit.path, edit.line)
            begin, end = (Characters(line, column) for column in (edit.column, edit.end_column))
            changes.append(Change(edit.path, edit.line, begin, end, edit.text))
        return changes

    def Callers(self, place: Place) -> list[Call]:
        return self._Calls(self.workspace.callers(*self._Asked(place)))

    def Callees(self, place: Place) -> list[Call]:
        return self._Calls(self.workspace.callees(*self._Asked(place)))

    def Open(self, path: str, text: str) -> None:
        self.workspace.open(path, text)
        self._texts.Open(path, text)

    def Close(self, path: str) -> None:
        self.workspace.close(path)
        self._texts.Close(path)

    def _Asked(self, place: Place) -> tuple[str, int, int]:
        return place.path, place.line, ByteColumn(self._texts.Line(place.path, place.line), place.column)

    def _Calls(self, calls: Iterable[Any]) -> list[Call]:
        return [
            Call(self._Found([each])[0], [site.place for site in self._Found(each.calls)], each.name) for each in calls
        ]

    def _Found(self, locations: Iterable[Any]) -> list[Found]:
        found = []
        for each in locations:
            line = self._texts.Line(each.path, each.line)
            begin, end = (Characters(line, column) for column in (each.column, each.end_column))
            found.append(Found(each.path, each.line, begin, end, each.certainty, each.role or "", each.kind or ""))
        return found


class JediEngine:
    """jedi in this process. What it does not know (types as text are its full names, callers) it gives as nothing."""

    name = "jedi"

    def __init__(
        self, roots: Sequence[str | Path], environment: str | Path | None = None, _version: object = None
    ) -> None:
        import jedi

        self._jedi = jedi
        added = [str(root) for root in roots[1:]]
        if environment is not None:
            added += map(str, sorted(Path(environment).glob("lib/python*/site-packages")))
        self._project = jedi.Project(str(roots[0]), added_sys_path=added)
        self._texts = Texts()

    def _Script(self, path: str) -> Any:
        return self._jedi.Script("\n".join(self._texts.Lines(path)), path=path, project=self._project)

    def _Found(self, names: Iterable[Any]) -> list[Found]:
        found = []
        for name in names:
            if name.line is not None:
                end = name.column + len(name.name)
                role = "definition" if name.is_definition() else ""
                found.append(Found(str(name.module_path), name.line, name.column, end, role=role, kind=name.type))
            elif name.module_path:
                found.append(Found(str(name.module_path), 1, 0, 0, role="definition", kind="module"))
        return found

    def Definitions(self, place: Place) -> list[Found]:
        return self._Found(self._Script(place.path).goto(place.line, place.column, follow_imports=True))

    def References(self, place: Place) -> list[Found]:
        return self._Found(self._Script(place.path).get_references(place.line, place.column))

    def Types(self, place: Place) -> list[str]:
        texts = []
        for name in self._Script(place.path).infer(place.line, place.column):
            full = name.full_name or name.name
            if name.type == "class":
                full = f"type[{full}]"
            elif name.type == "function":
                full = "def ()"
                if hints := [sign.to_string() for sign in name.get_signatures()]:
                    full = "def " + hints[0][len(name.name) :]
            elif name.type == "module":
                full = f"module {full}"
            texts.append("None" if full == "builtins.NoneType" else full)
        return texts

    TypesBefore = Types

    def Complete(self, place: Place) -> list[str]:
        return [completion.name for completion in self._Script(place.path).complete(place.line, place.column)]

    def Rename(self, place: Place, new_name: str) -> list[Change] | None:
        found = self.References(place)
        return [Change(each.path, each.line, each.column, each.end, new_name) for each in found]

    def Callers(self, _: Place) -> list[Call]:
        return []

    Callees = Callers

    def Open(self, path: str, text: str) -> None:
        self._texts.Open(path, text)

    def Close(self, path: str) -> None:
        self._texts.Close(path)


class ServerEngine:
    """A language server. What the protocol has no question for (types as text) it gives as nothing."""

    name = ""

    def __init__(
        self, roots: Sequence[str | Path], environment: str | Path | None = None, _version: object = None
    ) -> None:
        libraries = [str(path) for path in Path(environment or "/nowhere").glob("lib/python*/site-packages")]
        analysis = {"extraPaths": libraries, "diagnosticMode": "workspace"}
        settings = {"basedpyright": {"analysis": analysis}}
        self._server = Start(self.name, Path(roots[0]), settings=settings)
        self._opened: set[str] = set()

    def _Opened(self, place: Place) -> Place:
        if place.path not in self._opened:
            self._opened.add(place.path)
            self._server.Open(place.path)
        return place

    def Definitions(self, place: Place) -> list[Found]:
        return self._server.Definitions(self._Opened(place))

    def References(self, place: Place) -> list[Found]:
        return self._server.References(self._Opened(place))

    def Types(self, _: Place) -> list[str]:
        return []

    TypesBefore = Types

    def Complete(self, place: Place) -> list[str]:
        return self._server.Complete(self._Opened(place))

    def Rename(self, place: Place, new_name: str) -> list[Change] | None:
        return self._server.Rename(self._Opened(place), new_name)

    def Callers(self, place: Place) -> list[Call]:
        return self._server.Callers(self._Opened(place))

    def Callees(self, place: Place) -> list[Call]:
        return self._server.Callees(self._Opened(place))

    def Open(self, path: str, text: str) -> None:
        self.Close(path)
        self._opened.add(path)
        self._server.Open(path, text)

    def Close(self, path: str) -> None:
        if path in self._opened:
            self._opened.remove(path)
            self._server.Close(path)

    def __del__(self) -> None:
        self._server.Stop()


def _ServerEngines() -> dict[str, type[ServerEngine]]:
    return {name: type(f"{name}Engine", (ServerEngine,), {"name": name}) for name in COMMANDS if name != "jedi"}


# Each is made of the roots, an environment and a version.
ENGINES: dict[str, Callable[..., Engine]] = {"quillet": QuilletEngine, "jedi": JediEngine, **_ServerEngines()}


def AddEngine(parser: argparse.ArgumentParser) -> None:
    parser.add_argument("--engine", choices=tuple(ENGINES), default="quillet", help="who is asked (quillet)")


def ByteColumn(line: str, column: int) -> int:
    """The column from 1, in bytes of UTF-8, of one from 0 in characters."""
    return 1 + (column if line.isascii() else len(line[:column].encode()))


def Characters(line: str, column: int) -> int:
    """The other way about."""
    return column - 1 if line.isascii() else len(line.encode()[: column - 1].decode("utf-8", "replace"))


def Strong(found: Iterable[Found]) -> list[Found]:
    """Those of an answer that are more than candidates by their name."""
    return [each for each in found if each.certainty in STRONG]


def Answer(found: Iterable[Found]) -> list[Found]:
    """What one takes an answer to be: what is certain or likely, and candidates by name where nothing is."""
    found = list(found)
    return Strong(found) or found
