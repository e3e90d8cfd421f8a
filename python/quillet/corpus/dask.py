"""`quillet.corpus.records` for data frames and bags of Dask."""

from __future__ import annotations

from collections.abc import Iterator
from typing import Any

from quillet import corpus


def records(frame: Any, **options: Any) -> Any:
    """The records of the sources in a data frame, as one. The arguments are those of `quillet.corpus.records`."""
    import pandas
    import pyarrow

    def of_partition(part: Any, nothing: Any = None) -> Any:
        batches = list(corpus.records(pyarrow.Table.from_pandas(part, preserve_index=False), **options))
        strings = {pyarrow.string(): pandas.StringDtype("pyarrow")}
        return pyarrow.Table.from_batches(batches).to_pandas(types_mapper=strings.get) if batches else nothing

    nothing = of_partition(frame._meta_nonempty).iloc[:0]
    return frame.map_partitions(of_partition, nothing, meta=nothing)


def records_of_bag(bag: Any, **options: Any) -> Any:
    """The same for a bag of dictionaries with a source each, as a bag of dictionaries."""
    import pyarrow

    def of_partition(rows: Any) -> Iterator[Any]:
        for batch in corpus.records(pyarrow.Table.from_pylist(list(rows)), **options):
            yield from batch.to_pylist()

    return bag.map_partitions(of_partition)
