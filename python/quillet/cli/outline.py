"""`quillet outline`: the classes and functions of a file as a tree, with their parameters."""

from __future__ import annotations

from collections.abc import Iterator

from quillet.cli.defs import facts_of
from quillet.cli.find import fail
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import FileFacts, Hit
from quillet.index.store import CLASS, FUNCTION, IndexProblem


def run(path: str, *, index: str | None) -> int:
    """Runs the command and returns its exit code."""
    try:
        facts = facts_of(path, index, with_lines=False)
    except IndexProblem as problem:
        return fail(problem)
    found = False
    with quiet_output() as out:
        for line in outline(facts, Style.of_stdout()):
            found = True
            out.write(line)
    return 0 if found else 1


def outline(facts: FileFacts, style: Style) -> Iterator[str]:
    """The lines of the tree, each with the line number in front."""
    records = facts.hits
    digits = len(str(facts.lines))
    depths: dict[str, int] = {}
    for place, hit in enumerate(records):
        if hit.opens not in (CLASS, FUNCTION):
            continue
        depth = depths.get(hit.scope, 0)
        inner = f"{hit.scope}.{hit.name}" if hit.scope else hit.name
        depths[inner] = depth + 1
        if hit.opens == CLASS:
            what = f"class {style.name(printable(hit.name))}"
        else:
            what = f"def {style.name(printable(hit.name))}{printable(_signature(records, place, inner))}"
        yield f"{style.place(f'{hit.line:>{digits}}')} {'    ' * depth}{what}\n"


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
