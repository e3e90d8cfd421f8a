"""`quillet find`: the places where a name is set, read, called, imported or hinted at.

A line of output is `path:line:column: source line`, as compilers write it, so that terminals and editors
jump there. Answers are written as they are found. Exit codes are those of grep: 0 found, 1 nothing found,
2 wrong usage or no usable index.
"""

from __future__ import annotations

import sys
import time
from collections.abc import Iterator, Sequence
from itertools import groupby
from typing import NamedTuple, TextIO

from quillet.cli.find_options import ROLES
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import FLAGS, FileFacts, Folder, Hit, Index, Query, Sources, match_of
from quillet.index.store import IndexProblem, find_index

# As much of a source line is shown, in characters.
_WINDOW = 160
# How long written lines may wait for more of them, in seconds.
_PATIENCE = 0.1
# A search without an index that takes longer could be faster with one.
_SLOW = 1.0
# How many words that differ by case are tried where nothing is found.
_MOST_ALIKE = 5


class Form(NamedTuple):
    """How answers are written."""

    as_json: bool = False
    long: bool = False
    count_only: bool = False
    files_only: bool = False


def ask(
    name: str,
    *,
    returns: bool,
    scope: str | None,
    match: str | None,
    any_receiver: bool,
    path: str | None,
    as_json: bool,
    long: bool,
    count: bool,
    files: bool,
    index: str | None,
    roots: Sequence[str],
    exclude: Sequence[str],
    **roles: bool,
) -> int:
    """Runs the command with the parameters of `find_options` and returns its exit code."""
    if not name.strip("."):
        return fail(ValueError("NAME is empty"))
    if as_json + long + count + files > 1:
        return fail(ValueError("--json, --long, --count and --files are one instead of the other"))
    for text in (name, scope or ""):
        if any("\ud800" <= char <= "\udfff" for char in text):
            return fail(ValueError(f"{text}: is no UTF-8, which every name is"))
    wanted = tuple(role for role in ROLES if roles[f"role_{role}"])
    if any_receiver and match is None:
        match = "suffix"
    query = Query(name, match or match_of(name), wanted, returns, scope, path)
    return run(query, index=index, roots=roots, exclude=exclude, form=Form(as_json, long, count, files))


def run(query: Query, *, index: str | None, roots: Sequence[str], exclude: Sequence[str], form: Form) -> int:
    """Runs the command and returns its exit code."""
    start = time.monotonic()
    try:
        sources = sources_to_ask(index, roots, exclude)
    except IndexProblem as problem:
        return fail(problem)
    found = True  # where the reader went away: something was written
    with quiet_output() as out:
        found = show_answers(out, sources, sources.answers(query, with_lines=True), form)
    if isinstance(sources, Index):
        say_outside(sources)
    elif time.monotonic() - start > _SLOW:
        print("quillet: there is no index here or above; one is faster: quillet index .", file=sys.stderr)
    if not found:
        near = list(nearby(sources, query))
        if near:
            print(f"quillet: nothing found; try: {printable(', '.join(near))}", file=sys.stderr)
    return 0 if found else 1


def sources_to_ask(index: str | None, roots: Sequence[str], exclude: Sequence[str]) -> Sources:
    """The index that is named or that is nearest, and without one the working folder. Raises `IndexProblem`."""
    if index is None:
        try:
            index = find_index()
        except IndexProblem:
            return Folder(".", exclude=exclude)
    return Index(index, roots, exclude=exclude)


def fail(problem: Exception) -> int:
    """Says why there is no answer."""
    print(f"quillet: {printable(str(problem))}", file=sys.stderr)
    return 2


def say_outside(index: Index) -> None:
    """Says that files were left out, since they lie neither in the index's folder nor in one that was named."""
    if index.outside:
        noun = "file" if index.outside == 1 else "files"
        print(
            f"quillet: {index.outside} {noun} outside of {printable(index.base)} left out;"
            " name their folder with --root",
            file=sys.stderr,
        )


def show_answers(out: TextIO, sources: Sources, answers: Iterator[FileFacts], form: Form) -> bool:
    """Writes answers as they come, and returns whether there were any."""
    style = Style.of_stdout()
    places = 0
    flushed = 0.0
    for facts in answers:
        places += len({hit[1:3] for hit in facts.hits})
        path = sources.shown_path(facts.row.path)
        if form.files_only:
            out.write(f"{printable(path)}\n")
        elif not form.count_only:
            show_hits(out, path, facts, style, form)
        if time.monotonic() - flushed > _PATIENCE:
            out.flush()
            flushed = time.monotonic()
    if form.count_only:
        out.write(f"{places}\n")
    return places > 0


def show_hits(out: TextIO, path: str, facts: FileFacts, style: Style, form: Form) -> None:
    """Writes the answers of a file by their places, each with its source line."""
    pairs = zip(facts.hits, facts.source_lines, strict=True)
    if form.as_json:
        out.writelines(_json(path, hit, source) for hit, source in pairs)
        return
    for (line, column), records in groupby(pairs, key=lambda pair: (pair[0].line, pair[0].column)):
        group = list(records)
        out.write(place_text(path, line, column, group[0][1], style))
        if form.long:
            out.writelines(_detail_text(hit, style) for hit, _ in group)


def place_text(path: str, line: int, column: int, source: bytes, style: Style) -> str:
    """A place and its source line."""
    text = printable(source.decode("utf-8", "replace").strip())
    if len(text) > _WINDOW:
        text = text[: _WINDOW - 1] + "…"
    place = style.place(f"{printable(path)}:{line}:{column}:")
    return f"{place} {text}".rstrip() + "\n"


def _detail_text(hit: Hit, style: Style) -> str:
    from quillet._records import Record, RecordKind, describe

    if hit.kind == "called" and not hit.detail:
        said = "called"
    elif hit.kind in _ROLE_PHRASES:
        said = _ROLE_PHRASES[hit.kind]
    elif hit.kind == "import" and not hit.detail:
        said = "imported"
    else:
        said = describe(Record(hit.name, RecordKind(hit.kind), hit.detail, hit.is_parameter))
    where = f"  in {printable(hit.scope)}" if hit.scope else ""
    return f"    {style.name(printable(hit.name))}  {printable(said)}{where}\n"


# What roles that no kind of record has are called.
_ROLE_PHRASES = {"delete": "deleted", "keyword": "passed as a keyword", "declaration": "declared"}


def _json(path: str, hit: Hit, source: bytes) -> str:
    import json

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


# ---- where nothing is found ----


def nearby(sources: Sources, query: Query) -> Iterator[str]:
    """Questions near to one without an answer, as one types them, of those that have one."""
    seen = {query}
    for near in _neighbours(sources, query):
        if near not in seen:
            seen.add(near)
            if next(sources.find(near), None) is not None:
                yield _typed(near)


def _neighbours(sources: Sources, query: Query) -> Iterator[Query]:
    if query.scope is not None:
        yield query._replace(scope=None)
    if query.path is not None:
        yield query._replace(path=None)
    names = [query]
    if query.match == "exact":
        names.append(query._replace(name=f".{query.name}", match="suffix"))
        outer, dot, tail = query.name.rpartition(".")
        for word in sources.words_alike(tail)[:_MOST_ALIKE]:
            names.append(query._replace(name=outer + dot + word))
    elif query.match == "suffix":
        names.append(query._replace(name=query.name.lstrip("."), match="exact"))
    yield from names
    if query.roles or query.returns:
        for near in names:
            yield near._replace(roles=(), returns=False)


def _typed(query: Query) -> str:
    parts = [query.name if query.name.replace(".", "").replace("_", "").isalnum() else f"'{query.name}'"]
    parts += [f"--{role}" for role in query.roles]
    if query.returns:
        parts.append("--return")
    if query.scope is not None:
        parts.append(f"--scope {query.scope}")
    if query.path is not None:
        parts.append(f"--path '{query.path}'")
    if query.match != match_of(query.name):
        parts.append(f"--match {query.match}")
    return " ".join(parts)
