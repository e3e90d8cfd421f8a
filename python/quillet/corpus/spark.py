"""`quillet.corpus.records` for data frames of PySpark."""

from __future__ import annotations

from collections.abc import Iterable
from typing import Any

from quillet import corpus

_TYPES = {"string": "string", "int32": "integer", "int64": "long", "bool": "boolean"}


def records(frame: Any, *, keep: Iterable[str] = (), occurrences: bool = False, **options: Any) -> Any:
    """The records of the sources in a data frame, as one. The arguments are those of `quillet.corpus.records`."""
    from pyspark.sql.types import StructType

    kept = list(keep)
    schema = StructType([frame.schema[name] for name in kept])
    for name, kind, _ in corpus.schema("occurrences" if occurrences else "records"):
        schema = schema.add(name, _TYPES[kind])
    return frame.mapInArrow(
        lambda batches: corpus.records(batches, keep=kept, occurrences=occurrences, **options), schema
    )
