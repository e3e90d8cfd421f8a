"""`quillet find`: the places where a name is set, read, called, imported or hinted at.

A line of output is `path:line:column: source line`, as compilers write it, so that terminals and editors
jump there. Answers are written as they are found. Exit codes are those of grep: 0 found, 1 nothing found,
2 wrong usage or no usable index.
"""

from __future__ import annotations

import os
import sys
import time

from quillet.cli.find_options import ROLES
from quillet.cli.show import Style, printable
from quillet.cli.streams import bytes_writer, quiet_output
from quillet.index.questions import Folder, Index, Query, Sources, match_of
from quillet.index.store import IndexProblem, find_index

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterator, Sequence
    from typing import TextIO

# How long written lines may wait for more of them, in seconds.
_PATIENCE = 0.1
# A search without an index that takes longer could be faster with one.
_SLOW = 1.0
# How many words that differ by case are tried where nothing is found.
_MOST_ALIKE = 5


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
    resolve: bool,
    **roles: bool,
) -> int:
    """Runs the command with the parameters of `find_options` and returns its exit code."""
    if not name.strip("."):
        return fail(ValueError("NAME is empty"))
    forms = {"json": as_json, "long": long, "count": count, "files": files}
    if sum(forms.values()) > 1:
        return fail(ValueError("--json, --long, --count and --files are one instead of the other"))
    for text in (name, scope or ""):
        if any("\ud800" <= char <= "\udfff" for char in text):
            return fail(ValueError(f"{text}: is no UTF-8, which every name is"))
    wanted = tuple(role for role in ROLES if roles[f"role_{role}"])
    if resolve:
        others = {"return": returns, "scope": scope, "match": match, "any": any_receiver, "path": path, "long": long}
        for option, given in {**others, "index": index, "exclude": exclude}.items():
            if given:
                return fail(ValueError(f"--{option} and --resolve do not go together"))
        from quillet.cli.questions import resolve as run_resolved

        return run_resolved(name, roles=wanted, roots=roots, as_json=as_json, count=count, files=files)
    if any_receiver and match is None:
        match = "suffix"
    query = Query(name, match or match_of(name), wanted, returns, scope, path)
    form = next((form for form, wanted in forms.items() if wanted), "places")
    return run(query, index=index, roots=roots, exclude=exclude, form=form)


def run(query: Query, *, index: str | None, roots: Sequence[str], exclude: Sequence[str], form: str) -> int:
    """Runs the command and returns its exit code. `form` is places, long, json, count or files."""
    start = time.monotonic()
    try:
        sources = sources_to_ask(index, roots, exclude)
    except IndexProblem as problem:
        return fail(problem)
    found = True  # where the reader went away: something was written
    with quiet_output() as out:
        found = show_answers(out, sources, query, form)
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


def show_answers(out: TextIO, sources: Sources, query: Query, form: str) -> bool:
    """Writes answers as they come, and returns whether there were any."""
    write = bytes_writer(out)
    native_form = form if form in ("places", "long", "json") else "none"
    colours = form != "json" and Style.of_stdout().on
    total = 0
    flushed = 0.0
    for path, places, lines in sources.lines(query, native_form, colours=colours):
        total += places
        if form == "files":
            write(os.fsencode(printable(path)) + b"\n")
        else:
            write(lines)
        if time.monotonic() - flushed > _PATIENCE:
            out.flush()
            flushed = time.monotonic()
    if form == "count":
        write(b"%d\n" % total)
    return total > 0


# ---- where nothing is found ----


def nearby(sources: Sources, query: Query) -> Iterator[str]:
    """Questions near to one without an answer, as one types them, of those that have one."""
    seen = {_typed(query)}
    for near in _neighbours(sources, query):
        typed = _typed(near)
        if typed not in seen:
            seen.add(typed)
            if next(sources.lines(near, "none"), None) is not None:
                yield typed


def _neighbours(sources: Sources, query: Query) -> Iterator[Query]:
    if query.scope is not None:
        yield query.but(scope=None)
    if query.path is not None:
        yield query.but(path=None)
    names = [query]
    if query.match == "exact":
        names.append(query.but(name=f".{query.name}", match="suffix"))
        outer, dot, tail = query.name.rpartition(".")
        for word in sources.words_alike(tail)[:_MOST_ALIKE]:
            names.append(query.but(name=outer + dot + word))
    elif query.match == "suffix":
        names.append(query.but(name=query.name.lstrip("."), match="exact"))
    yield from names
    if query.roles or query.returns:
        for near in names:
            yield near.but(roles=(), returns=False)


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
