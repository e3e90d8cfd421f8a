"""Writes an index as JSON lines: a header, then each file, its records and its errors. ASCII only."""

from __future__ import annotations

import json
import os
from collections.abc import Iterator

from quillet.index.questions import Index

# The `schema` of the header; raised where a key changes its meaning or goes.
JSON_SCHEMA = 1


def json_lines(index: Index, base: str) -> Iterator[str]:
    """The lines without their ends. Paths are given from the folder `base`."""
    encode = json.JSONEncoder(ensure_ascii=True, separators=(",", ":")).encode
    yield encode({"type": "header", "format": "quillet-index", "schema": JSON_SCHEMA, "python": index.python()})
    for row in index.files():
        path = os.path.relpath(index.full_path(row.path), base).replace(os.sep, "/")
        file = {"type": "file", "path": path, "lines": row.lines, "hash": row.hash.hex()}
        if row.problem is not None:
            file["problem"] = row.problem
        yield encode(file)
        for hit in index.records_of(row):
            yield encode({"type": "record", **hit._asdict(), "path": path, "opens": _OPENS[hit.opens]})
        for line, column, message in index.errors_of(row):
            yield encode({"type": "error", "path": path, "line": line, "column": column, "message": message})


_OPENS = (None, "class", "def")
