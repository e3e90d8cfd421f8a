"""`quillet find`: the places where a name is set, read, called, imported or hinted at.

A line of output is `path:line:column: source line`, as compilers write it, so that terminals and editors
jump there. Exit codes are those of grep: 0 found, 1 nothing found, 2 wrong usage or no usable index.
"""

from __future__ import annotations

import sys
from collections.abc import Sequence
from itertools import groupby
from typing import TextIO

from quillet.cli.find_options import ROLES
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import FileRow, Hit, Index, Query, match_of
from quillet.index.source import SourceFile
from quillet.index.store import IndexProblem, find_index

# As much of a source line is shown, in characters.
_WINDOW = 160


def ask(
    name: str,
    *,
    returns: bool,
    scope: str | None,
    match: str | None,
    as_json: bool,
    long: bool,
    index: str | None,
    **roles: bool,
) -> int:
    """Runs the command with the parameters of `find_options` and returns its exit code."""
    if not name.strip("."):
        return fail(ValueError("NAME is empty"))
    wanted = tuple(role for role in ROLES if roles[f"role_{role}"])
    query = Query(name, match or match_of(name), wanted, returns, scope)
    return run(query, index=index, as_json=as_json, long=long)


def run(query: Query, *, index: str | None, as_json: bool, long: bool) -> int:
    """Runs the command and returns its exit code."""
    try:
        with Index(index or find_index()) as opened:
            hits = opened.find(query)
            with quiet_output() as out:
                show_hits(out, opened, hits, as_json=as_json, long=long)
    except IndexProblem as problem:
        return fail(problem)
    return 0 if hits else 1


def fail(problem: Exception) -> int:
    """Says why there is no answer."""
    print(f"quillet: {printable(str(problem))}", file=sys.stderr)
    return 2


def show_hits(out: TextIO, index: Index, hits: Sequence[Hit], *, as_json: bool, long: bool) -> None:
    """Writes records by their places, each with its source line."""
    style = Style.of_stdout()
    rows = index.files_of({hit.path for hit in hits})
    for stored, in_file in groupby(hits, key=lambda hit: hit.path):
        path = index.shown_path(stored)
        source = open_source(index, rows.get(stored))
        for _, records in groupby(in_file, key=lambda hit: (hit.line, hit.column)):
            group = list(records)
            if as_json:
                out.writelines(_json(path, hit, source) for hit in group)
            else:
                out.write(place_text(path, group[0].line, group[0].column, source, style))
                if long:
                    out.writelines(_detail_text(hit, style) for hit in group)
        if source.changed:
            out.flush()
            say_changed(path)


def open_source(index: Index, row: FileRow | None) -> SourceFile:
    """The source of a file of the index."""
    if row is None:
        raise IndexProblem(f"{index.path}: the index changed under the question; ask again")
    return SourceFile(index.full_path(row.path), row)


def say_changed(path: str) -> None:
    """Says that a file is not what was indexed, so that its lines may have moved."""
    print(f"quillet: {printable(path)}: changed since it was indexed; run: quillet index", file=sys.stderr)


def place_text(path: str, line: int, column: int, source: SourceFile, style: Style) -> str:
    """A place and its source line."""
    text = printable(source.line(line).decode("utf-8", "replace").strip())
    if len(text) > _WINDOW:
        text = text[: _WINDOW - 1] + "…"
    place = style.place(f"{printable(path)}:{line}:{column}:")
    return f"{place} {text}".rstrip() + "\n"


def _detail_text(hit: Hit, style: Style) -> str:
    from quillet._records import Record, RecordKind, describe

    said = describe(Record(hit.name, RecordKind(hit.kind), hit.detail, hit.is_parameter))
    where = f"  in {printable(hit.scope)}" if hit.scope else ""
    return f"    {style.name(printable(hit.name))}  {printable(said)}{where}\n"


def _json(path: str, hit: Hit, source: SourceFile) -> str:
    import json

    row = {
        "type": "record",
        "path": path,
        "line": hit.line,
        "column": hit.column,
        "scope": hit.scope,
        "name": hit.name,
        "kind": hit.kind,
        "detail": hit.detail,
        "is_parameter": hit.is_parameter,
        "source": source.line(hit.line).decode("utf-8", "backslashreplace"),
        "changed": source.changed,
    }
    return json.dumps(row, ensure_ascii=True, separators=(",", ":")) + "\n"
