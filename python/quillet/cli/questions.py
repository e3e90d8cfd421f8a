"""`quillet goto`, `references`, `complete`, `type`, `hover`, `callers`, `rename` and `find --resolve`: questions about
a program, asked at a place of a file.

An answer that is a place is `path:line:column: source line`, as those of `find`, with how sure it is behind it where
that is not certain. Exit codes: 0 there is an answer, 1 there is none, 2 wrong usage, a file that cannot be read, or a
rename that cannot be done.
"""

from __future__ import annotations

import os
import sys
from collections.abc import Callable, Iterable, Sequence
from typing import NamedTuple, TextIO, cast

from quillet._workspace import Location, RenameError, Workspace
from quillet.cli.show import Style, place_text, printable
from quillet.cli.streams import quiet_output

TYPE_CHECKING = False
if TYPE_CHECKING:
    from quillet._workspace import Certainty

# By what a folder is known as that of a project.
_PROJECT_FILES = (".git", "pyproject.toml", "setup.py", "setup.cfg")


class Settings(NamedTuple):
    """What the options of a question say."""

    roots: Sequence[str] = ()
    environment: str | None = None
    version: tuple[int, int] | None = None
    as_json: bool = False


class Place(NamedTuple):
    """Where a question is asked, as FILE:LINE:COLUMN says it."""

    path: str
    line: int
    column: int


def place_of(target: str) -> Place:
    """The place that a text names. Raises `ValueError` for any other text."""
    path, *numbers = target.rsplit(":", 2)
    if not path or len(numbers) != 2 or not all(number.isascii() and number.isdigit() for number in numbers):
        raise ValueError(f"{target}: is no FILE:LINE:COLUMN")
    line, column = (min(int(number), 2**31 - 1) for number in numbers)
    if not line or not column:
        raise ValueError(f"{target}: lines and columns count from 1")
    return Place(path, line, column)


def project_of(path: str) -> str:
    """The folder of the project that a file belongs to: the nearest one with the files of a project, and without one
    the working folder, where the file lies in it.
    """
    own = folder = os.path.dirname(os.path.abspath(path))
    while True:
        if any(os.path.lexists(os.path.join(folder, name)) for name in _PROJECT_FILES):
            return folder
        above = os.path.dirname(folder)
        if above == folder:
            break
        folder = above
    here = os.getcwd()
    return here if own == here or own.startswith(here.rstrip(os.sep) + os.sep) else own


def workspace_of(path: str, settings: Settings) -> Workspace:
    """The workspace in which a question about a file is asked. Raises `OSError` and `ValueError`."""
    roots = settings.roots or (project_of(path),)
    return Workspace(*roots, environment=settings.environment, version=settings.version)


def ask(kind: str, target: str, settings: Settings, *, at_least: str = "by name") -> int:
    """Answers a question of a kind of `QUESTIONS` and returns the exit code of the command."""
    try:
        place = place_of(target)
        workspace = workspace_of(place.path, settings)
        question = QUESTIONS[kind]
        found = False
        with quiet_output() as out:
            answer = _Answer(out, workspace, settings.as_json, cast("Certainty", at_least))
            found = question(answer, place)
    except (OSError, ValueError) as problem:
        if isinstance(problem, BrokenPipeError):
            raise
        return fail(said(problem))
    if workspace.was_bounded:
        print("quillet: there may be more: the search met its bound", file=sys.stderr)
    return 0 if found else 1


def fail(problem: Exception) -> int:
    """Says why there is no answer."""
    print(f"quillet: {printable(str(problem))}", file=sys.stderr)
    return 2


def said(problem: OSError | ValueError) -> Exception:
    """A problem in words: a file that cannot be read with its name in front."""
    if isinstance(problem, OSError) and problem.filename is not None:
        name = os.fsdecode(problem.filename) if isinstance(problem.filename, (str, bytes)) else str(problem.filename)
        return ValueError(f"{name}: {problem.strerror}")
    return problem


class _Answer:
    """Where answers are written, and how."""

    def __init__(self, out: TextIO, workspace: Workspace, as_json: bool, at_least: Certainty = "by name") -> None:
        self.workspace = workspace
        self.at_least = at_least
        self.as_json = as_json
        self._out = out
        self._style = Style.of_stdout()

    def name(self, text: str) -> str:
        return self._style.name(printable(text))

    def line(self, text: str) -> None:
        self._out.write(f"{text}\n")

    def row(self, row_type: str, /, **fields: object) -> None:
        import json

        self._out.write(json.dumps({"type": row_type, **fields}, separators=(",", ":")) + "\n")

    def place(self, place: Location, note: str = "") -> None:
        source = self.workspace.source_line(place.path, place.line)
        if self.as_json:
            self.row("location", **place._asdict(), source=source.decode("utf-8", "backslashreplace"))
            return
        notes = [] if place.certainty == "certain" else [f"[{place.certainty}]"]
        if note:
            notes.append(note)
        shown = place_text(shown_path(place.path), place.line, place.column, source, self._style)
        self.line("  ".join([shown, *notes]))

    def places(self, places: Iterable[Location]) -> bool:
        found = False
        for place in places:
            found = True
            self.place(place)
        return found


def shown_path(path: str) -> str:
    """A path as one would write it here: from the working folder, where it lies in that."""
    here = os.getcwd()
    return os.path.relpath(path, here) if path.startswith(here.rstrip(os.sep) + os.sep) else path


def _goto(answer: _Answer, place: Place) -> bool:
    return answer.places(answer.workspace.definitions(*place, at_least=answer.at_least))


def _references(answer: _Answer, place: Place) -> bool:
    return answer.places(answer.workspace.references(*place, at_least=answer.at_least))


def _types(answer: _Answer, place: Place) -> bool:
    types = answer.workspace.types(*place)
    for text in types:
        if answer.as_json:
            answer.row("type", text=text)
        else:
            answer.line(printable(text))
    return bool(types)


def _hover(answer: _Answer, place: Place) -> bool:
    hover = answer.workspace.hover(*place)
    if hover is None:
        return False
    if answer.as_json:
        answer.row("hover", **hover._asdict())
        return True
    note = "" if hover.certainty == "certain" else f"  [{hover.certainty}]"
    answer.line(answer.name(hover.text) + note)
    if hover.documentation:
        answer.line("")
        for line in hover.documentation.splitlines():
            answer.line(printable(line))
    return True


def _complete(answer: _Answer, place: Place) -> bool:
    completions = answer.workspace.complete(*place)
    for item in completions:
        if answer.as_json:
            answer.row("completion", **item._asdict())
        else:
            detail = f"  {printable(item.detail)}" if item.detail else ""
            answer.line(f"{answer.name(item.name)}  {item.kind}{detail}")
    return bool(completions)


def _callers(answer: _Answer, place: Place) -> bool:
    callers = answer.workspace.callers(*place)
    for caller in callers:
        if answer.as_json:
            calls = [call._asdict() for call in caller.calls]
            answer.row("caller", **{**caller._asdict(), "calls": calls})
            continue
        for call in caller.calls:
            answer.place(call, f"in {answer.name(caller.name)}")
    return bool(callers)


QUESTIONS: dict[str, Callable[[_Answer, Place], bool]] = {
    "goto": _goto,
    "references": _references,
    "type": _types,
    "hover": _hover,
    "complete": _complete,
    "callers": _callers,
}

# ---- find --resolve ----

# What the roles of `find` are among those of places.
_FIND_ROLES: dict[str, Callable[[Location], bool]] = {
    "set": lambda place: place.role == "write" or (place.role == "definition" and place.kind == "variable"),
    "get": lambda place: place.role == "read",
    "call": lambda place: place.role == "call",
    "import": lambda place: place.role == "import",
    "param": lambda place: place.kind == "parameter",
    "def": lambda place: place.role == "definition" and place.kind in ("class", "function", "type_alias"),
    "delete": lambda place: place.role == "delete",
    "keyword": lambda place: place.role == "keyword",
}


def resolve(name: str, *, roles: Sequence[str], roots: Sequence[str], as_json: bool, count: bool, files: bool) -> int:
    """The places that name what the project defines by a dotted name, of these roles or of all."""
    unknown = [role for role in roles if role not in _FIND_ROLES]
    if unknown:
        return fail(ValueError(f"--{unknown[0]} and --resolve do not go together"))
    try:
        workspace = Workspace(*(roots or (project_of(os.path.join(os.getcwd(), "x")),)))
        defined = workspace.named(name)
        found: dict[tuple[str, int, int], Location] = {}
        for definition in defined:
            for place in workspace.references(definition.path, definition.line, definition.column):
                known = found.get(place[:3])
                if known is None or _surer(place, known):
                    found[place[:3]] = place
    except (OSError, ValueError) as problem:
        return fail(said(problem))
    if not defined:
        print(f"quillet: {printable(name)} is defined nowhere in {printable(workspace.roots[0])}", file=sys.stderr)
    wanted = [_FIND_ROLES[role] for role in roles]
    places = [
        place for _, place in sorted(found.items()) if not wanted or any(is_wanted(place) for is_wanted in wanted)
    ]
    with quiet_output() as out:
        answer = _Answer(out, workspace, as_json)
        if count:
            answer.line(str(len(places)))
        elif files:
            for path in dict.fromkeys(place.path for place in places):
                answer.line(printable(shown_path(path)))
        else:
            answer.places(places)
    return 0 if places else 1


def _surer(place: Location, other: Location) -> bool:
    order = ("certain", "likely", "by name")
    return order.index(place.certainty) < order.index(other.certainty)


# ---- rename ----


def rename(target: str, new_name: str, settings: Settings, *, write: bool, only_certain: bool) -> int:
    """Shows what a new name changes as a unified diff, or makes the changes."""
    from quillet.cli.edits import FileEdits, edited_files

    try:
        place = place_of(target)
        workspace = workspace_of(place.path, settings)
        edits = workspace.rename(*place, new_name, only_certain=only_certain)
        changed: list[FileEdits] = edited_files(edits)
        if write:
            for file in changed:
                file.write()
    except RenameError as problem:
        return fail(problem)
    except (OSError, ValueError) as problem:
        return fail(said(problem))
    with quiet_output() as out:
        if settings.as_json:
            answer = _Answer(out, workspace, True)
            for edit in edits:
                answer.row("edit", **edit._asdict())
        elif not write:
            for file in changed:
                out.flush()
                out.buffer.write(file.diff(shown_path(file.path)))
        else:
            places = "place" if len(edits) == 1 else "places"
            files = "file" if len(changed) == 1 else "files"
            out.write(f"changed {len(edits)} {places} in {len(changed)} {files}\n")
    return 0 if edits else 1
