"""`quillet defs`: what a file defines, each at its place."""

from __future__ import annotations

import os

from quillet.cli.files import problem_of
from quillet.cli.find import Form, fail, show_hits
from quillet.cli.show import Style
from quillet.cli.streams import quiet_output
from quillet.index.questions import FileFacts, Folder, Index, Sources, definitions_in, row_of
from quillet.index.store import IndexProblem, find_index


def run(path: str, *, index: str | None, as_json: bool, imports: bool) -> int:
    """Runs the command and returns its exit code."""
    try:
        facts = facts_of(path, index, with_lines=True)
    except IndexProblem as problem:
        return fail(problem)
    lines = dict(zip(facts.hits, facts.source_lines, strict=True))
    hits = definitions_in(facts.hits, imports=imports)
    hits.sort(key=lambda hit: (hit.line, hit.column))
    with quiet_output() as out:
        shown = facts._replace(hits=hits, source_lines=[lines[hit] for hit in hits])
        show_hits(out, shown_path(path), shown, Style.of_stdout(), Form(as_json=as_json))
    return 0 if hits else 1


def facts_of(path: str, index: str | None, *, with_lines: bool) -> FileFacts:
    """What a file says that a person names, read as the Python of the index that is named or nearest.

    Raises `IndexProblem` for an index that is named and cannot be used, and a file that cannot be read.
    """
    try:
        status = os.stat(path)
    except (OSError, ValueError) as error:
        raise IndexProblem(f"{path}: {problem_of(error) if isinstance(error, OSError) else error}") from error
    sources: Sources = Folder(".", version_of(index))
    row = row_of(os.fsencode(os.path.abspath(path)), status.st_size)
    [facts] = sources.facts([row], sources.everything(with_lines=with_lines))
    if facts.problem is not None:
        raise IndexProblem(f"{path}: {facts.problem}")
    return facts


def shown_path(path: str) -> str:
    """A file's path for people: from the working folder where it lies below it."""
    return os.path.abspath(path).removeprefix(os.path.join(os.getcwd(), ""))


def version_of(index: str | None) -> tuple[int, int] | None:
    """The version that an index was made for, the one that is named or the nearest; None where there is none."""
    if index is not None:
        return Index(index).version
    try:
        return Index(find_index()).version
    except IndexProblem:
        return None
