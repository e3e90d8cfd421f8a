"""`quillet defs`: what a file defines, each at its place."""

from __future__ import annotations

import json
import os

from quillet.cli.files import problem_of
from quillet.cli.find import fail
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.facts import FileFacts, Hit, definitions_in, row_of
from quillet.index.questions import FLAGS, Folder, Index, Sources
from quillet.index.store import IndexProblem, find_index

TYPE_CHECKING = False
if TYPE_CHECKING:
    from quillet.tarvex import _host

# As much of a source line is shown, in characters.
_WINDOW = 160


def run(path: str, *, index: str | None, as_json: bool, imports: bool) -> int:
    """Runs the command and returns its exit code."""
    try:
        facts = facts_of(path, index, Folder.everything(with_lines=True))
    except IndexProblem as problem:
        return fail(problem)
    lines = dict(zip(facts.hits, facts.source_lines, strict=True))
    hits = definitions_in(facts.hits, imports=imports)
    hits.sort(key=lambda hit: (hit.line, hit.column))
    style = Style.of_stdout()
    place = None
    with quiet_output() as out:
        for hit in hits:
            if as_json:
                out.write(_json(shown_path(path), hit, lines[hit]))
            elif (hit.line, hit.column) != place:
                place = hit.line, hit.column
                out.write(_place_text(shown_path(path), hit, lines[hit], style))
    return 0 if hits else 1


def _place_text(path: str, hit: Hit, source: bytes, style: Style) -> str:
    text = printable(source.decode("utf-8", "replace").strip())
    if len(text) > _WINDOW:
        text = text[: _WINDOW - 1] + "…"
    place = style.place(f"{printable(path)}:{hit.line}:{hit.column}:")
    return f"{place} {text}".rstrip() + "\n"


def _json(path: str, hit: Hit, source: bytes) -> str:
    receiver, dot, _ = hit.name.rpartition(".")
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
        "source": source.decode("utf-8", "backslashreplace"),
        "changed": False,
        "role": hit.role,
        "flags": [word for bit, word in enumerate(FLAGS) if hit.flags >> bit & 1],
        "receiver": receiver if dot else None,
    }
    return json.dumps(row, ensure_ascii=True, separators=(",", ":")) + "\n"


def facts_of(path: str, index: str | None, question: _host.Question) -> FileFacts:
    """What a file that a person names answers to a question, read as the Python of the index that is named or nearest.

    Raises `IndexProblem` for an index that is named and cannot be used, and a file that cannot be read.
    """
    try:
        status = os.stat(path)
    except (OSError, ValueError) as error:
        raise IndexProblem(f"{path}: {problem_of(error) if isinstance(error, OSError) else error}") from error
    sources: Sources = Folder(".", version_of(index))
    row = row_of(os.fsencode(os.path.abspath(path)), status.st_size)
    [facts] = sources.facts([row], question)
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
