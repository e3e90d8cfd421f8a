"""`quillet defs`: what a file defines, each at its place."""

from __future__ import annotations

from quillet.cli.find import fail, show_hits
from quillet.cli.streams import quiet_output
from quillet.index.questions import FileRow, Index
from quillet.index.store import IndexProblem, find_index


def run(path: str, *, index: str | None, as_json: bool) -> int:
    """Runs the command and returns its exit code."""
    try:
        with Index(index or find_index()) as opened:
            hits = opened.definitions_of(file_of(opened, path))
            hits.sort(key=lambda hit: (hit.line, hit.column))
            with quiet_output() as out:
                show_hits(out, opened, hits, as_json=as_json, long=False)
    except IndexProblem as problem:
        return fail(problem)
    return 0 if hits else 1


def file_of(index: Index, path: str) -> FileRow:
    """The file that a person names. Raises `IndexProblem` where the index does not have it."""
    row = index.file(path)
    if row is None:
        raise IndexProblem(f"{path}: is not in the index; add it with: quillet index {path} -o {index.path}")
    return row
