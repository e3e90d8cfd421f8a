"""A corpus as shards: units of input that one worker turns into Parquet files of their own.

A shard is a pair of files of the same name, in `files` and in `records` (or `occurrences`). Each is written beside its
place, forced to disk and renamed, that of the records last: so a shard is complete where its records are. The
manifest says which units make which shard, and is written once, before the first of them.

The rows of a shard are sorted in runs of some hundred thousand, by name, then as they came; a run is several row
groups. So the statistics of a row group say which few names it holds, and a question for a name skips nearly all of
them.
"""

from __future__ import annotations

import json
import os
import sys
import tempfile
import time
from collections.abc import Iterable, Iterator
from contextlib import suppress
from typing import Any, NamedTuple

from quillet._languages import decode_source
from quillet.corpus import RecordBatch, Version, languages_of, schema
from quillet.corpus.sources import Columns, Row, Unit, read
from quillet.tarvex import _host

MANIFEST = "manifest.json"
_FORMAT = 1
_SUMMARY_KEY = "quillet.summary"
# Bytes of source that a shard holds, nearly.
_SHARD_BYTES = 64 << 20
# What is handed to the analysis at once, and sorted at once: rows and bytes.
_BATCH_ROWS, _BATCH_BYTES = 256, 2 << 20
_RUN_ROWS, _RUN_BYTES = 200_000, 32 << 20
_GROUP_ROWS = 25_000
# Columns with few texts for their rows are handed on as dictionaries; the writer finds the others by itself.
_FEW_TEXTS = ("package", "source", "path", "kind", "role")


class CorpusError(Exception):
    """A run cannot begin or go on; the message says why."""


class Plan(NamedTuple):
    """What a run is to do, as the manifest has it."""

    out: str
    form: str  # "records" or "occurrences"
    version: Version
    columns: Columns
    shards: list[list[Unit]]

    def path_of(self, shard: int, form: str | None = None) -> str:
        """The file of a shard."""
        return os.path.join(self.out, form or self.form, f"part-{shard:06}.parquet")

    def is_done(self, shard: int) -> bool:
        """Whether a shard is complete."""
        return os.path.exists(self.path_of(shard))


class Summary(NamedTuple):
    """What became of a shard, or of several."""

    files: int = 0
    bytes: int = 0
    lines: int = 0
    rows: int = 0
    errors: int = 0
    problems: int = 0
    seconds: float = 0.0  # of processor time
    megabytes: int = 0  # that the worker held at most

    def __add__(self, other: object) -> Summary:
        if not isinstance(other, Summary):
            return NotImplemented
        added: list[Any] = [mine + theirs for mine, theirs in zip(self, other, strict=True)]
        return Summary(*added)._replace(megabytes=max(self.megabytes, other.megabytes))


# ---- the manifest ----


def plan_of(out: str, form: str, version: Version, columns: Columns, units: Iterable[Unit]) -> Plan:
    """The plan for some units: that of the manifest in `out` where there is one, for the same units, or a new one.

    Raises `CorpusError` where `out` holds a run over something else.
    """
    plan = Plan(os.path.abspath(out), form, version, columns, _packed(units))
    manifest = os.path.join(plan.out, MANIFEST)
    text = json.dumps(_described(plan), separators=(",", ":"))
    try:
        with open(manifest, encoding="utf-8") as file:
            if file.read() != text:
                raise CorpusError(f"{out} holds a run over other inputs or with other options; name another folder")
    except FileNotFoundError:
        names = os.listdir(plan.out) if os.path.isdir(plan.out) else []
        if not all(name.startswith(_UNFINISHED) for name in names):
            raise CorpusError(f"{out} is neither empty nor holds a run") from None
        os.makedirs(plan.out, exist_ok=True)
        with _beside(manifest) as path, open(path, "w", encoding="utf-8") as file:
            file.write(text)
    for folder in (form, "files"):
        os.makedirs(os.path.join(plan.out, folder), exist_ok=True)
    return plan


def remove_leftovers(plan: Plan) -> None:
    """Removes what killed workers left, where no other run is under way."""
    for folder in (plan.out, os.path.join(plan.out, plan.form), os.path.join(plan.out, "files")):
        for name in os.listdir(folder):
            if name.startswith(_UNFINISHED):
                with suppress(OSError):
                    os.unlink(os.path.join(folder, name))


def _described(plan: Plan) -> dict[str, Any]:
    version = list(plan.version) if isinstance(plan.version, tuple) else plan.version
    return {
        "format": _FORMAT,
        "rows": plan.form,
        "version": version,
        "columns": list(plan.columns),
        "shards": [[list(unit) for unit in shard] for shard in plan.shards],
    }


def _packed(units: Iterable[Unit]) -> list[list[Unit]]:
    shards: list[list[Unit]] = []
    weight = _SHARD_BYTES
    for unit in units:
        if weight >= _SHARD_BYTES or weight + unit.weight > 2 * _SHARD_BYTES:
            shards.append([])
            weight = 0
        shards[-1].append(unit)
        weight += unit.weight
    return shards


# ---- a shard ----


def run_shard(plan: Plan, shard: int) -> Summary:
    """Makes a shard, unless it is complete, and tells what became of it. For a worker of any engine.

    `plan` needs no more shards than this one; see `task_of`.
    """
    if plan.is_done(shard):
        return summary_of(plan, shard)
    import pyarrow

    # A worker is one thread.
    pyarrow.set_cpu_count(1)
    started = time.process_time()
    rows = (row for unit in plan.shards[shard] for row in read(Unit(*unit), plan.columns))
    with (
        _beside(plan.path_of(shard)) as records_path,
        _beside(plan.path_of(shard, "files")) as files_path,
        _RunWriter(records_path, plan.form) as records,
        _RunWriter(files_path, "files") as files,
    ):
        _analyze(plan, rows, records, files)
        totals = files.totals
        summary = Summary(
            files.rows,
            totals["bytes"],
            totals["lines"],
            records.rows,
            totals["errors"],
            files.problems,
            round(time.process_time() - started, 3),
            _most_megabytes(),
        )
        records.note(_SUMMARY_KEY, json.dumps(summary))
    return summary


def task_of(plan: Plan, shard: int) -> tuple[Plan, int]:
    """The arguments of `run_shard` with the units of this shard alone, to be sent to a worker."""
    shards: list[list[Unit]] = [[]] * shard
    return plan._replace(shards=[*shards, plan.shards[shard]]), shard


def summary_of(plan: Plan, shard: int) -> Summary:
    """What became of a shard that is complete."""
    from pyarrow import parquet

    return Summary(*json.loads(parquet.read_metadata(plan.path_of(shard)).metadata[_SUMMARY_KEY.encode()]))


def _analyze(plan: Plan, rows: Iterator[Row], records: _RunWriter, files: _RunWriter) -> None:
    import pyarrow

    native = _host.SourceRows(
        languages_of(plan.version), plan.form, "path", "content", ["package", "source"], decode_source, "problem"
    )

    def write(capsules: tuple[object, object] | None, writer: _RunWriter) -> bool:
        if capsules is not None:
            writer.add(pyarrow.record_batch(RecordBatch(capsules)))
        return capsules is not None

    for batch in _batches(rows):
        native.Begin(*batch.__arrow_c_array__())
        while write(native.Next(), records):
            pass
        if records.is_full:
            records.flush()
            write(native.TakeFiles(), files)
    while write(native.Finish(), records):
        pass
    write(native.TakeFiles(), files)


def _batches(rows: Iterator[Row]) -> Iterator[Any]:
    """Rows as record batches of moderate size, strings apart from bytes, since bytes are decoded."""
    import pyarrow

    taken: list[Row] = []
    held = 0
    kind: type = bytes
    schema = {"package": pyarrow.string(), "source": pyarrow.string(), "path": pyarrow.string()}

    def batch() -> Any:
        content = pyarrow.string() if kind is str else pyarrow.binary()
        types = [*schema.values(), content, pyarrow.string()]
        arrays = [
            pyarrow.array(column, kind_of) for column, kind_of in zip(zip(*taken, strict=True), types, strict=True)
        ]
        return pyarrow.record_batch(arrays, names=[*schema, "content", "problem"])

    for row in rows:
        content = row[3]
        own_kind = kind if content is None else type(content)
        if taken and (len(taken) >= _BATCH_ROWS or held >= _BATCH_BYTES or own_kind is not kind):
            yield batch()
            taken, held = [], 0
        kind = own_kind
        taken.append(row)
        held += len(content or ())
    if taken:
        yield batch()


def _most_megabytes() -> int:
    try:
        # What getrusage says counts the process that this one was started by, too.
        with open("/proc/self/status", encoding="ascii") as file:
            return next(int(line.split()[1]) for line in file if line.startswith("VmHWM")) >> 10
    except (OSError, StopIteration):
        pass
    try:
        import resource
    except ImportError:  # not on Windows
        return 0
    return resource.getrusage(resource.RUSAGE_SELF).ru_maxrss >> (20 if sys.platform == "darwin" else 10)


# ---- Parquet ----


class _RunWriter:
    """Writes a Parquet file of a form in runs that are sorted by a column of strings."""

    def __init__(self, path: str, form: str) -> None:
        self._path = path
        self._form = form
        self._key = {"records": "name", "occurrences": "text", "files": "path"}[form]
        self._batches: list[Any] = []
        self._held_rows = self._held_bytes = 0
        self._writer: Any = None
        self.rows = 0
        self.problems = 0
        self.totals = {"bytes": 0, "lines": 0, "errors": 0}

    def __enter__(self) -> _RunWriter:
        return self

    def __exit__(self, exc_type: object, exc: object, traceback: object) -> None:
        try:
            if exc_type is None:
                self.flush()
        finally:
            if self._writer is not None:
                self._writer.close()

    @property
    def is_full(self) -> bool:
        """Whether a run has come together."""
        return self._held_rows >= _RUN_ROWS or self._held_bytes >= _RUN_BYTES

    def add(self, batch: Any) -> None:
        """Takes rows."""
        import pyarrow.compute

        self._batches.append(batch)
        self._held_rows += batch.num_rows
        self._held_bytes += batch.nbytes
        self.rows += batch.num_rows
        for name in self.totals:
            if name in batch.schema.names:
                self.totals[name] += pyarrow.compute.sum(batch[name]).as_py() or 0
        if "problem" in batch.schema.names:
            self.problems += batch.num_rows - batch["problem"].null_count

    def note(self, key: str, text: str) -> None:
        """Writes what is held, and a text beside the rows."""
        self.flush()
        if self._writer is None:
            self._open(_plain_schema(self._form))
        self._writer.add_key_value_metadata({key: text})

    def flush(self) -> None:
        """Sorts and writes what is held."""
        import pyarrow

        if not self._batches:
            return
        table = pyarrow.Table.from_batches(self._batches).combine_chunks()
        self._batches.clear()
        self._held_rows = self._held_bytes = 0
        keys, order = _ranked(_whole(table[self._key]))
        columns = {}
        for name in table.schema.names:
            column = _whole(table[name])
            if name == self._key:
                column = keys
            elif name in _FEW_TEXTS:
                column = column.dictionary_encode()
            columns[name] = column
        table = pyarrow.table(columns)
        for start in range(0, table.num_rows, _GROUP_ROWS):
            # Taken group by group, so that a run is in memory once.
            group = table.take(order.slice(start, _GROUP_ROWS))
            at = group.schema.get_field_index(self._key)
            group = group.set_column(at, self._key, _narrowed(_whole(group[self._key])))
            if self._writer is None:
                self._open(group.schema)
            self._writer.write_table(group, row_group_size=_GROUP_ROWS)
        pyarrow.default_memory_pool().release_unused()

    def _open(self, schema: Any) -> None:
        from pyarrow import parquet

        key = schema.get_field_index(self._key)
        self._writer = parquet.ParquetWriter(
            self._path,
            schema,
            compression="zstd",
            compression_level=1,
            store_schema=False,
            sorting_columns=[parquet.SortingColumn(key)],
        )


def _ranked(texts: Any) -> tuple[Any, Any]:
    """A column as a dictionary whose texts are sorted, and the order of the rows by it."""
    from pyarrow import DictionaryArray, compute

    coded = texts.dictionary_encode()
    order = compute.sort_indices(coded.dictionary)
    codes = compute.sort_indices(order).cast("int32").take(coded.indices)
    return DictionaryArray.from_arrays(codes, coded.dictionary.take(order)), compute.sort_indices(codes)


def _narrowed(keys: Any) -> Any:
    """Of a column that is sorted, the dictionary without what it does not hold."""
    from pyarrow import DictionaryArray, compute

    first, last = keys.indices[0], keys.indices[-1]
    texts = keys.dictionary.slice(first.as_py(), last.as_py() - first.as_py() + 1)
    return DictionaryArray.from_arrays(compute.subtract(keys.indices, first), texts)


def _whole(column: Any) -> Any:
    """A column of a table as one array."""
    return column.chunk(0) if column.num_chunks == 1 else column.combine_chunks()


def _plain_schema(form: str) -> Any:
    import pyarrow

    kept = [("package", "string", True), ("source", "string", True)]
    return pyarrow.schema([(name, pyarrow.type_for_alias(kind)) for name, kind, _ in [*kept, *schema(form)]])


_UNFINISHED = ".unfinished-"


class _beside:
    """The path of a file that is written beside its place, forced to disk and put there at the end of the block."""

    def __init__(self, target: str) -> None:
        self._target = target
        handle, self._path = tempfile.mkstemp(prefix=_UNFINISHED, dir=os.path.dirname(target))
        os.close(handle)

    def __enter__(self) -> str:
        return self._path

    def __exit__(self, exc_type: object, exc: object, traceback: object) -> None:
        if exc_type is not None:
            os.unlink(self._path)
            return
        umask = os.umask(0)
        os.umask(umask)
        os.chmod(self._path, 0o666 & ~umask)
        _force(self._path)
        os.replace(self._path, self._target)
        _force(os.path.dirname(self._target))


def _force(path: str) -> None:
    if os.name != "posix":  # a folder cannot be opened elsewhere
        return
    handle = os.open(path, os.O_RDONLY)
    try:
        os.fsync(handle)
    finally:
        os.close(handle)
