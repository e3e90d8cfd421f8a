"""Corpora: more code than one machine holds, analysed by whatever engine has it.

`records` maps record batches of sources to record batches of what they say, and `files` to a row a source. Both
stream on one thread, so that an engine (Spark, Ray, Dask, a loop) decides what runs where. They speak the Arrow
PyCapsule interface, so nothing needs pyarrow: whatever has `__arrow_c_array__` or `__arrow_c_stream__` goes in, and
what comes out has `__arrow_c_array__`. Batches of pyarrow come out as batches of pyarrow.
"""

from __future__ import annotations

import sys
from collections.abc import Iterable, Iterator
from typing import Any, Literal

from quillet._languages import decode_source, native_language_of
from quillet.tarvex import _host

__all__ = ["AUTO_VERSIONS", "RecordBatch", "files", "records", "schema"]

Version = tuple[int, ...] | Literal["auto"] | None
_Capsules = tuple[object, object]

# What "auto" decides between: before 3.7 "async" was a name.
AUTO_VERSIONS = ((3, 13), (3, 6), (2, 7))

# What the formats of the C data interface are called, where they occur in `schema`.
_TYPE_NAMES = {"i": "int32", "l": "int64", "u": "string", "b": "bool"}


class RecordBatch:
    """A record batch for readers of the Arrow PyCapsule interface, such as `pyarrow.record_batch`. It is read once."""

    def __init__(self, capsules: _Capsules) -> None:
        self._capsules = capsules

    def __arrow_c_array__(self, requested_schema: object = None) -> _Capsules:
        """Capsules of the schema and the array. The schema is fixed."""
        return self._capsules


def records(
    batches: Iterable[Any],
    *,
    path: str = "path",
    content: str = "content",
    keep: Iterable[str] = (),
    version: Version = None,
    occurrences: bool = False,
) -> Iterator[Any]:
    """Maps record batches of sources to record batches of their records.

    A row of the input is a source: its name in the column `path`, its text in `content`, which may be bytes or
    strings in any layout. Bytes are decoded as Python does, strings are taken as they are. The columns of the result
    are those of `keep`, carried along; `path`; and `schema("records")`, or with `occurrences` those of
    `schema("occurrences")`. `version` is the Python that the sources are written for, as for `analyze`; with "auto"
    it is that of `AUTO_VERSIONS` in which a source has the fewest syntax errors.

    No source ends the run. Its syntax errors, and why it could not be read, are rows with a message in `error`.
    Raises `TypeError` and `ValueError` for wrong arguments, and for columns that are missing or of a wrong type.
    """
    return _mapped(batches, "occurrences" if occurrences else "records", path, content, keep, version)


def files(
    batches: Iterable[Any],
    *,
    path: str = "path",
    content: str = "content",
    keep: Iterable[str] = (),
    version: Version = None,
) -> Iterator[Any]:
    """Maps record batches of sources to record batches with a row a source: what `schema("files")` says of it.

    The arguments are those of `records`.
    """
    return _mapped(batches, "files", path, content, keep, version)


def schema(form: str = "records") -> list[tuple[str, str, bool]]:
    """The columns of "records", "occurrences" or "files" behind those that are kept: name, type, may be null."""
    columns = [("path", "u", True), *_host.SourceRows.Columns(form)]
    return [(name, _TYPE_NAMES[kind], may_be_null) for name, kind, may_be_null in columns]


def languages_of(version: Version) -> list[_host.Language]:
    """What sources of a version are read by."""
    if isinstance(version, str):
        if version != "auto":
            raise ValueError(f'version must be a tuple such as (3, 12) or "auto", not {version!r}')
        return [native_language_of(each) for each in AUTO_VERSIONS]
    return [native_language_of(version)]


def _mapped(
    batches: Iterable[Any], form: str, path: str, content: str, keep: Iterable[str], version: Version
) -> Iterator[Any]:
    if isinstance(keep, str):
        raise TypeError("keep is a sequence of names")
    kept = [name for name in keep if name != "path" or path != "path"]
    rows = _host.SourceRows(languages_of(version), form, path, content, kept, decode_source)
    return _map(rows, _batches_of(batches))


def _map(rows: _host.SourceRows, batches: Iterator[tuple[_Capsules, bool]]) -> Iterator[Any]:
    for_pyarrow = False
    for capsules, for_pyarrow in batches:
        rows.Begin(*capsules)
        while (table := rows.Next()) is not None:
            yield _batch(table, for_pyarrow)
    while (table := rows.Finish()) is not None:
        yield _batch(table, for_pyarrow)


def _batch(capsules: _Capsules, for_pyarrow: bool) -> Any:
    batch = RecordBatch(capsules)
    return sys.modules["pyarrow"].record_batch(batch) if for_pyarrow else batch


def _batches_of(batches: Iterable[Any]) -> Iterator[tuple[_Capsules, bool]]:
    """The batches as capsules, and whether they are pyarrow's."""
    if hasattr(batches, "__arrow_c_stream__") or hasattr(batches, "__arrow_c_array__"):
        batches = (batches,)
    for batch in batches:
        is_of_pyarrow = type(batch).__module__.partition(".")[0] == "pyarrow"
        if hasattr(batch, "__arrow_c_array__"):
            yield batch.__arrow_c_array__(), is_of_pyarrow
        elif hasattr(batch, "__arrow_c_stream__"):
            stream = _host.StreamBatches(batch.__arrow_c_stream__())
            while (capsules := stream.Next()) is not None:
                yield capsules, is_of_pyarrow
        else:
            raise TypeError(f"a record batch of Arrow is needed, not {type(batch).__name__}")
