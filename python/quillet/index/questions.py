"""Asks an index: where is a name set, read, called, imported, and what does a function return.

Names are numbered in the index, so a question first finds the numbers of the names that it means, then
their records by an index on those. A dotted suffix is found by what stands behind the last dot.
"""

from __future__ import annotations

import os
from collections.abc import Iterable, Iterator, Sequence
from typing import Any, NamedTuple, TypeVar

from quillet.index.paths import full_path, stored_path
from quillet.index.store import CLASS, FILE_SHIFT, FUNCTION, KIND_NUMBER, KINDS, explained, open_to_read, tail_of

# What the options of `quillet find` ask for. A record is wanted when one of the roles takes it.
ROLES = {
    "set": "(r.kind IN ({set}, {within_expr}) AND NOT r.is_parameter)",
    "get": "(r.kind = {get})",
    "call": "(r.kind = {called})",
    "import": "(r.kind IN ({import}, {from_import}, {import_as}))",
    "param": "(r.kind = {set} AND r.is_parameter)",
    "hint": "(r.kind = {hint})",
}
_VARIABLES = 500
_Value = TypeVar("_Value")
_FILE_COLUMNS = "id, path, size, mtime_ns, hash, lines, records, problem"
_COLUMNS = "f.path, r.line, r.column, s.name, n.name, r.kind, d.detail, r.is_parameter, r.opens"
_TABLES = (
    f"records r JOIN files f ON f.id = r.id >> {FILE_SHIFT} JOIN names n ON n.id = r.name"
    " JOIN names s ON s.id = r.scope JOIN details d ON d.id = r.detail"
)


class Hit(NamedTuple):
    """A record that answers a question. `path` is as stored; lines and columns count from 1."""

    path: bytes
    line: int
    column: int
    scope: str
    name: str
    kind: str
    detail: str
    is_parameter: bool
    opens: int


class FileRow(NamedTuple):
    """What the index knows of a file itself."""

    id: int
    path: bytes
    size: int
    mtime_ns: int
    hash: bytes
    lines: int
    records: int
    problem: str | None


class Query(NamedTuple):
    """A question for a name. `match` is exact, suffix or glob; no roles means every record."""

    name: str
    match: str
    roles: tuple[str, ...] = ()
    returns: bool = False
    scope: str | None = None


class Index:
    """An open index. Use it as a context manager. Raises `IndexProblem` where it cannot be used."""

    def __init__(self, path: str) -> None:
        self.path = os.path.abspath(path)
        self.base = os.path.dirname(self.path)
        self._working_folder = os.path.join(os.getcwd(), "")
        self._connection = open_to_read(path)

    def __enter__(self) -> Index:
        return self

    def __exit__(self, *_: object) -> None:
        self._connection.close()

    def _rows(self, sql: str, values: Iterable[object] = ()) -> list[Any]:
        with explained(self.path):
            return self._connection.execute(sql, tuple(values)).fetchall()

    # ---- names ----

    def find(self, query: Query) -> list[Hit]:
        """The records that a question asks for, by path, line and column."""
        hits: list[Hit] = []
        if query.roles or not query.returns:
            roles = " OR ".join(ROLES[role].format(**KIND_NUMBER) for role in query.roles)
            condition = f"({roles})" if roles else "1"
            hits += self._records(self._names(query.name, query.match), condition)
            if query.match == "exact" and "." in query.name:
                hits += self._members(query.name, condition)
        if query.returns:
            hits += self._returns(query.name, query.match)
        if query.scope is not None:
            hits = [hit for hit in hits if scope_matches(hit.scope, query.scope)]
        # A record may be asked for twice; the order of records of one place is that of the statement.
        unique = list(dict.fromkeys(hits))
        unique.sort(key=lambda hit: hit[:3])
        return unique

    def _names(self, name: str, match: str) -> list[int]:
        if match == "exact":
            return [row[0] for row in self._rows("SELECT id FROM names WHERE name = ?", (name,))]
        if match == "suffix":
            dotted = name if name.startswith(".") else "." + name
            rows = self._rows("SELECT id, name FROM names WHERE tail = ?", (tail_of(name),))
            return [number for number, text in rows if text == name or text.endswith(dotted)]
        pattern = name.replace("[", "[[]")
        return [row[0] for row in self._rows("SELECT id FROM names WHERE name GLOB ?", (pattern,))]

    def _records(self, names: Sequence[int], condition: str) -> Iterator[Hit]:
        for part in _parts(names):
            marks = ",".join("?" * len(part))
            yield from self._hits(f"SELECT {_COLUMNS} FROM {_TABLES} WHERE r.name IN ({marks}) AND {condition}", part)

    def _hits(self, sql: str, values: Iterable[object]) -> Iterator[Hit]:
        for path, line, column, scope, name, kind, detail, is_parameter, opens in self._rows(sql, values):
            yield Hit(path, line, column, scope, name, KINDS[kind], detail, bool(is_parameter), opens)

    def _members(self, name: str, condition: str) -> Iterator[Hit]:
        """What is set in the scope that a dotted name ends in: `Shop.add` is the `add` of the class Shop."""
        scope, _, member = name.rpartition(".")
        for hit in self._records(self._names(member, "exact"), f"r.kind = {KIND_NUMBER['set']} AND {condition}"):
            if not hit.is_parameter and scope_ends(hit.scope, scope):
                yield hit

    def _returns(self, name: str, match: str) -> Iterator[Hit]:
        """What the functions of a name return and yield, and the hints for it."""
        scopes = self._names(name, "glob") if match == "glob" else self._names(name.lstrip("."), "suffix")
        for part in _parts(scopes):
            marks = ",".join("?" * len(part))
            yield from self._hits(
                f"SELECT {_COLUMNS} FROM {_TABLES} WHERE r.scope IN ({marks})"
                " AND r.name IN (SELECT id FROM names WHERE name IN ('return', 'yield'))",
                part,
            )

    # ---- files ----

    def files(self) -> list[FileRow]:
        """All files, by path."""
        return [FileRow(*row) for row in self._rows(f"SELECT {_FILE_COLUMNS} FROM files ORDER BY path")]

    def files_of(self, stored: Iterable[bytes]) -> dict[bytes, FileRow]:
        """The files of paths as the index keeps them, without those that it does not have."""
        found = {}
        for part in _parts(list(stored)):
            marks = ",".join("?" * len(part))
            for row in self._rows(f"SELECT {_FILE_COLUMNS} FROM files WHERE path IN ({marks})", part):
                found[row[1]] = FileRow(*row)
        return found

    def file(self, path: str) -> FileRow | None:
        """A file by a path as a person names it, or None where the index does not have it."""
        stored = stored_path(path, self.base)
        return self.files_of([stored]).get(stored)

    def records_of(self, file: FileRow) -> list[Hit]:
        """All records of a file, in the order in which they were found."""
        ends = (file.id << FILE_SHIFT, (file.id + 1) << FILE_SHIFT)
        return list(self._hits(f"SELECT {_COLUMNS} FROM {_TABLES} WHERE r.id >= ? AND r.id < ? ORDER BY r.id", ends))

    def definitions_of(self, file: FileRow) -> list[Hit]:
        """What a file defines: its classes and functions, and the names set in its module and classes."""
        inside = {""}
        found = []
        for hit in self.records_of(file):
            if hit.opens == CLASS:
                inside.add(f"{hit.scope}.{hit.name}" if hit.scope else hit.name)
            if hit.kind != "set" or hit.is_parameter:
                continue
            if hit.opens in (CLASS, FUNCTION) or hit.scope in inside:
                found.append(hit)
        return found

    def errors_of(self, file: FileRow) -> list[tuple[int, int, str]]:
        """The syntax errors of a file as line, column and message."""
        ends = (file.id << FILE_SHIFT, (file.id + 1) << FILE_SHIFT)
        return self._rows("SELECT line, column, message FROM errors WHERE id >= ? AND id < ? ORDER BY id", ends)

    def errors(self) -> int:
        """The number of all syntax errors."""
        number: int = self._rows("SELECT count(*) FROM errors")[0][0]
        return number

    def kinds(self) -> list[tuple[str, int]]:
        """How many records there are of each kind, most first."""
        rows = self._rows("SELECT kind, count(*) FROM records GROUP BY kind ORDER BY 2 DESC")
        return [(KINDS[number], count) for number, count in rows]

    def counts(self) -> dict[str, int]:
        """Totals of files, lines and records."""
        files, lines, records = self._rows(
            "SELECT count(*), coalesce(sum(lines), 0), coalesce(sum(records), 0) FROM files"
        )[0]
        return {"files": files, "lines": lines, "records": records}

    def most_used(self, count: int) -> list[tuple[str, int]]:
        """The names that most records are of."""
        return self._rows(
            "SELECT n.name, r.number FROM (SELECT name, count(*) AS number FROM records GROUP BY name"
            " ORDER BY number DESC LIMIT ?) r JOIN names n ON n.id = r.name ORDER BY r.number DESC, n.name",
            (count,),
        )

    def python(self) -> str:
        """The version of Python that the last run read files as."""
        return str(self._rows("SELECT value FROM meta WHERE key = 'python'")[0][0])

    def full_path(self, stored: bytes) -> str:
        """The absolute path of a file."""
        return full_path(stored, self.base)

    def shown_path(self, stored: bytes) -> str:
        """A file's path for people: from the working folder where it lies below it."""
        path = self.full_path(stored)
        return path.removeprefix(self._working_folder)


def _parts(values: Sequence[_Value]) -> Iterator[Sequence[_Value]]:
    """As many values at a time as a statement takes."""
    for start in range(0, len(values), _VARIABLES):
        yield values[start : start + _VARIABLES]


def match_of(name: str) -> str:
    """How a name is meant: ".attr" as a suffix, one with * or ? as a pattern, any other as it is."""
    if "*" in name or "?" in name:
        return "glob"
    return "suffix" if name.startswith(".") else "exact"


def scope_ends(scope: str, suffix: str) -> bool:
    """Whether a dotted scope is `suffix` or ends in it."""
    return scope == suffix or scope.endswith("." + suffix)


def scope_matches(scope: str, wanted: str) -> bool:
    """Whether a scope is the one that is wanted, or lies in it; `wanted` may be a pattern."""
    if "*" in wanted or "?" in wanted:
        from fnmatch import fnmatchcase

        return fnmatchcase(scope, wanted.replace("[", "[[]"))
    return f".{wanted}." in f".{scope}."
