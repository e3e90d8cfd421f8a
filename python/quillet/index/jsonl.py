"""Writes what an index's files say as JSON lines: a header, then each file, its records and its errors. ASCII only."""

from __future__ import annotations

import json
import os
from collections.abc import Iterator

from quillet.index.questions import Index
from quillet.index.source import content_hash

# The `schema` of the header; raised where a key changes its meaning or goes.
JSON_SCHEMA = 1


def json_lines(index: Index, base: str) -> Iterator[str]:
    """The lines without their ends. Paths are given from the folder `base`."""
    encode = json.JSONEncoder(ensure_ascii=True, separators=(",", ":")).encode
    yield encode({"type": "header", "format": "quillet-index", "schema": JSON_SCHEMA, "python": index.python()})
    for facts in index.facts(index.files()):
        full = index.full_path(facts.row.path)
        path = os.path.relpath(full, base).replace(os.sep, "/")
        file = {"type": "file", "path": path, "lines": facts.lines, "hash": content_hash(full).hex()}
        if facts.problem is not None:
            file["problem"] = facts.problem
        yield encode(file)
        for hit in facts.hits:
            row = {"type": "record", **hit._asdict(), "path": path, "opens": _OPENS[hit.opens]}
            # What occurrences are is no part of a record.
            del row["role"], row["flags"]
            yield encode(row)
        for line, column, message in facts.errors:
            yield encode({"type": "error", "path": path, "line": line, "column": column, "message": message})


_OPENS = (None, "class", "def")
