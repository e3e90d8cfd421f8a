"""Where a name stands in a corpus: row groups whose statistics leave no room for it are not read."""

from __future__ import annotations

import os
from collections.abc import Iterator
from typing import Any

from quillet.corpus.shards import MANIFEST, CorpusError

_COLUMNS = ("source", "path", "line", "column", "name", "kind", "detail", "is_parameter")


def find(out: str, name: str, kinds: tuple[str, ...] = ()) -> Iterator[dict[str, Any]]:
    """The records of a name in the corpus at `out`, with `kinds` those of some kinds.

    A name that begins with a dot is any attribute of this name, which nothing but a look at all names can find.
    Raises `CorpusError` where there is no corpus.
    """
    from pyarrow import compute, dataset

    folder = os.path.join(out, "records")
    if not (os.path.isfile(os.path.join(out, MANIFEST)) and os.path.isdir(folder)):
        raise CorpusError(f"{out} holds no records of a corpus")
    files = sorted(os.path.join(folder, file) for file in os.listdir(folder) if file.endswith(".parquet"))
    if not files:
        return
    wanted = compute.ends_with(compute.field("name"), name) if name.startswith(".") else compute.field("name") == name
    wanted &= compute.field("error").is_null()
    if kinds:
        wanted &= compute.field("kind").isin(kinds)
    for batch in dataset.dataset(files, format="parquet").scanner(columns=list(_COLUMNS), filter=wanted).to_batches():
        yield from batch.to_pylist()
