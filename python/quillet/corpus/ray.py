"""`quillet.corpus.records` for data sets of Ray."""

from __future__ import annotations

from collections.abc import Iterator
from typing import Any

from quillet import corpus


def records(dataset: Any, **options: Any) -> Any:
    """The records of the sources in a data set, as one. The arguments are those of `quillet.corpus.records`."""

    def of_block(block: Any) -> Iterator[Any]:
        import pyarrow

        for batch in corpus.records(block, **options):
            yield pyarrow.Table.from_batches([batch])

    return dataset.map_batches(of_block, batch_format="pyarrow", batch_size=None, zero_copy_batch=True)
