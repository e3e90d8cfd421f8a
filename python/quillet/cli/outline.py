"""`quillet outline`: the classes and functions of a file as a tree, with their parameters.

The definitions are those of the file's names, so one that has a syntax error is among them, and marked. The hints
are those of its records.
"""

from __future__ import annotations

from collections.abc import Iterator

from quillet._batch import analyze_files
from quillet._names import FileBindings, Occurrence
from quillet.cli.defs import facts_of, version_of
from quillet.cli.find import fail
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import FileFacts, Hit
from quillet.index.store import CLASS, FUNCTION, IndexProblem


def run(path: str, *, index: str | None) -> int:
    """Runs the command and returns its exit code."""
    try:
        facts = facts_of(path, index, with_lines=False)
        [result] = analyze_files([path], version=version_of(index), jobs=1, bindings=True)
        if result.problem is not None:
            raise IndexProblem(f"{path}: {result.problem}")
    except IndexProblem as problem:
        return fail(problem)
    found = False
    with quiet_output() as out:
        for line in outline(facts, result.bindings, Style.of_stdout()):
            found = True
            out.write(line)
    return 0 if found else 1


def outline(facts: FileFacts, bindings: FileBindings, style: Style) -> Iterator[str]:
    """The lines of the tree, each with the line number in front."""
    occurrences = list(bindings.occurrences)
    digits = len(str(facts.lines))
    recorded = {(hit.line, hit.column): place for place, hit in enumerate(facts.hits) if hit.opens in (CLASS, FUNCTION)}
    for index, occurrence in enumerate(occurrences):
        if occurrence.role != "definition" or occurrence.kind not in ("class", "function"):
            continue
        place = recorded.get((occurrence.line, occurrence.column))
        signature = mark = ""
        if place is not None:
            hit = facts.hits[place]
            if hit.opens == FUNCTION:
                signature = _signature(facts.hits, place, f"{hit.scope}.{hit.name}" if hit.scope else hit.name)
        else:
            mark = "  " + style.error("syntax error")
            if occurrence.kind == "function":
                signature = f"({', '.join(_parameters(bindings, occurrences, index))})"
        word = "class" if occurrence.kind == "class" else "def"
        what = f"{word} {style.name(printable(occurrence.text))}{printable(signature)}{mark}"
        yield f"{style.place(f'{occurrence.line:>{digits}}')} {'    ' * _depth(bindings, occurrence)}{what}\n"


def _depth(bindings: FileBindings, occurrence: Occurrence) -> int:
    """How many classes and functions stand around a name."""
    depth = 0
    at: int | None = occurrence.scope
    while at is not None:
        scope = bindings.scopes[at]
        depth += scope.kind in ("class", "function")
        at = scope.parent
    return depth


def _parameters(bindings: FileBindings, occurrences: list[Occurrence], index: int) -> Iterator[str]:
    """The parameters of the function whose name stands at an index: those of the first function behind it, as far as
    they stand in front of any other definition.
    """
    function = None
    for occurrence in occurrences[index + 1 :]:
        if occurrence.kind in ("class", "function") and occurrence.role == "definition":
            return
        if occurrence.kind == "parameter" and bindings.scopes[occurrence.scope].kind == "function":
            function = occurrence.scope if function is None else function
            if occurrence.scope == function:
                yield occurrence.text


def _signature(records: list[Hit], place: int, inner: str) -> str:
    """The parameters and hints of a function, which follow its own record in the records of its statement."""
    hints: dict[str, str] = {}
    parameters = []
    for hit in records[place + 1 :]:
        if hit.opens or (hit.is_parameter and hit.scope != inner):
            break
        if hit.is_parameter and hit.kind == "set":
            parameters.append(hit.name)
        elif hit.is_parameter and hit.kind == "hint":
            hints[hit.name] = hit.detail
        elif not hit.is_parameter and hit.scope == inner:
            break
    shown = ", ".join(f"{name}: {hints[name]}" if name in hints else name for name in parameters)
    returned = f" -> {hints['return']}" if "return" in hints else ""
    return f"({shown}){returned}"
