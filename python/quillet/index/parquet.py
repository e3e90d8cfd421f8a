"""Writes the records of an index as a Parquet file, by pyarrow where it is installed."""

from __future__ import annotations

import os
from typing import Any

from quillet.index.questions import Index


class MissingPackage(Exception):
    """A package that this needs is not installed; the text says how to get it."""


def write_parquet(index: Index, target: str) -> None:
    """Writes the file, a row group a batch of files. Raises `MissingPackage` and OSError."""
    pyarrow = load_pyarrow()
    from pyarrow import parquet  # type: ignore[import-not-found, unused-ignore]

    texts = pyarrow.dictionary(pyarrow.int32(), pyarrow.string())
    schema = pyarrow.schema(
        [
            ("path", texts),
            ("line", pyarrow.int32()),
            ("column", pyarrow.int32()),
            ("scope", texts),
            ("name", texts),
            ("kind", texts),
            ("detail", pyarrow.string()),
            ("is_parameter", pyarrow.bool_()),
        ]
    )
    base = os.getcwd()
    with parquet.ParquetWriter(target, schema, compression="zstd") as writer:
        rows: list[dict[str, Any]] = []
        for row in index.files():
            path = os.fsencode(os.path.relpath(index.full_path(row.path), base)).decode("utf-8", "backslashreplace")
            rows += ({**hit._asdict(), "path": path} for hit in index.records_of(row))
            if len(rows) >= 1 << 17:
                writer.write_table(pyarrow.Table.from_pylist(rows, schema))
                rows = []
        writer.write_table(pyarrow.Table.from_pylist(rows, schema))


def load_pyarrow() -> Any:
    """The package pyarrow. Raises `MissingPackage`."""
    try:
        import pyarrow  # type: ignore[import-not-found, unused-ignore]
    except ImportError as error:
        raise MissingPackage("Parquet needs the package pyarrow; install it with: pip install pyarrow") from error
    return pyarrow
