"""What files say, as objects: files, their records and what they add up to."""

from __future__ import annotations

from collections.abc import Iterable
from typing import NamedTuple

from quillet.index.store import CLASS, FUNCTION


class Hit(NamedTuple):
    """A record or an occurrence that answers a question. `path` is as stored; lines and columns count from 1.

    `kind` is that of the record, and of an occurrence that no record tells of the kind of the record that
    would, or its role. `role` is None where there is no occurrence of the name.
    """

    path: bytes
    line: int
    column: int
    scope: str
    name: str
    kind: str
    detail: str
    is_parameter: bool
    opens: int
    role: str | None
    flags: int


class FileRow(NamedTuple):
    """What is known of a file without a look at it. Without an index, only its path and size."""

    number: int
    path: bytes
    size: int
    mtime_ns: int
    hash: int
    lines: int
    records: int
    errors: int
    problem: str | None


class FileFacts(NamedTuple):
    """What a file says as it is now. `problem` says why it could not be analysed."""

    row: FileRow
    hits: list[Hit]
    source_lines: list[bytes]  # of the hits, where they were asked for
    errors: list[tuple[int, int, str]]
    lines: int
    problem: str | None


class Counts(NamedTuple):
    """Totals of files as they are now. `kinds` and `names` are the most frequent ones first."""

    files: int
    lines: int
    records: int
    errors: int
    kinds: list[tuple[str, int]]
    names: list[tuple[str, int]]


def row_of(path: bytes, size: int = 0, number: int = 0) -> FileRow:
    """A file of which nothing is known but that it is there."""
    return FileRow(number, path, size, 0, 0, 0, 0, 0, None)


def definitions_in(hits: Iterable[Hit], *, imports: bool = False) -> list[Hit]:
    """What a file defines, out of its records: its classes and functions, and the names set in its module
    and classes; names that an import binds are another file's, and come with `imports`.
    """
    hits = list(hits)
    imported = {} if imports else imports_in(hits)
    inside = {""}
    found = []
    for hit in hits:
        if hit.opens == CLASS:
            inside.add(f"{hit.scope}.{hit.name}" if hit.scope else hit.name)
        if hit.kind != "set" or hit.is_parameter or (hit.line, hit.column) in imported:
            continue
        if hit.opens in (CLASS, FUNCTION) or hit.scope in inside:
            found.append(hit)
    return found


def imports_in(hits: Iterable[Hit]) -> dict[tuple[int, int], str]:
    """The places where an import binds a name, by line and column, and whether it names a module or what is in
    one: "import" or "from_import".
    """
    return {(hit.line, hit.column): hit.kind for hit in hits if hit.kind in ("import", "from_import")}
