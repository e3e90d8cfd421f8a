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
from quillet.index.questions import Folder, Index, Query, Sources, match_of, roles_of
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
# How many of them are looked at for what they are, and how many roles of a name are said.
_MOST_LOOKED_AT = 1000
_MOST_ROLES = 3


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

    def has_answer(near: Query) -> bool:
        typed = _typed(near)
        if typed in seen:
            return False
        seen.add(typed)
        return next(sources.lines(near, "none"), None) is not None

    if query.scope is not None and has_answer(near := query.but(scope=None)):
        yield _typed(near)
    if query.path is not None and has_answer(near := query.but(path=None)):
        yield _typed(near)
    for near in _other_names(sources, query):
        if has_answer(near):
            yield _typed(near)
        elif query.roles or query.returns:
            # What it is instead.
            for role in _roles_of(sources, near.but(roles=(), returns=False)):
                if has_answer(other := near.but(roles=(role,), returns=False)):
                    yield _typed(other)


def _other_names(sources: Sources, query: Query) -> Iterator[Query]:
    """The question itself, and the same for names and patterns that are nearly the same."""
    yield query
    if query.match == "exact":
        yield query.but(name=f".{query.name}", match="suffix")
    elif query.match == "suffix":
        yield query.but(name=query.name.lstrip("."), match="exact")
    for name in _in_other_cases(sources, query.name):
        yield query.but(name=name)


def _in_other_cases(sources: Sources, name: str) -> Iterator[str]:
    """A name or a pattern as others are spelt that differ from it by the case of letters alone, but for itself."""
    from itertools import islice, product

    parts = []
    for part in name.split("."):
        alike = sources.words_alike(part) if part.strip("*?") else []
        spelt = dict.fromkeys([part, *(_in_case_of(word, part) for word in alike)])
        parts.append(list(spelt)[: _MOST_ALIKE + 1])
    return islice(map(".".join, product(*parts)), 1, _MOST_ALIKE + 1)


def _in_case_of(word: str, pattern: str) -> str:
    """The pattern with its letters as a word has them that fits it in another case."""
    import re

    pieces = re.split("([*?])", pattern)
    regex = "".join(
        f"({re.escape(piece)})" if i % 2 == 0 else f"({piece.replace('*', '.*').replace('?', '.')})"
        for i, piece in enumerate(pieces)
    )
    found = re.fullmatch(regex, word, re.IGNORECASE)
    spelt = found.groups() if found else pieces
    return "".join(piece if i % 2 else spelt[i] for i, piece in enumerate(pieces))


def _roles_of(sources: Sources, query: Query) -> list[str]:
    """What the first answers to a question are, at most so many roles, in the order of the options."""
    from itertools import islice

    found = {role for hit in islice(sources.find(query), _MOST_LOOKED_AT) for role in roles_of(hit)}
    return [role for role in ROLES if role in found][:_MOST_ROLES]


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
