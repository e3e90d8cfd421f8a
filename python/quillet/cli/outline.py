"""`quillet outline`: the classes and functions of a file as a tree, with their parameters."""

from __future__ import annotations

from collections.abc import Iterator

from quillet.cli.defs import file_of
from quillet.cli.find import fail, open_source, say_changed
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import FileRow, Hit, Index
from quillet.index.store import CLASS, FUNCTION, IndexProblem, find_index


def run(path: str, *, index: str | None) -> int:
    """Runs the command and returns its exit code."""
    try:
        with Index(index or find_index()) as opened:
            row = file_of(opened, path)
            style = Style.of_stdout()
            found = False
            with quiet_output() as out:
                for line in outline(opened, row, style):
                    found = True
                    out.write(line)
                if open_source(opened, row).changed:
                    out.flush()
                    say_changed(opened.shown_path(row.path))
    except IndexProblem as problem:
        return fail(problem)
    return 0 if found else 1


def outline(index: Index, row: FileRow, style: Style) -> Iterator[str]:
    """The lines of the tree, each with the line number in front."""
    records = index.records_of(row)
    digits = len(str(row.lines))
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
