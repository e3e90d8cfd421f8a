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
from collections.abc import Iterable
from contextlib import suppress
from typing import Any, NamedTuple

from quillet._languages import decode_source
from quillet.corpus import Version, languages_of
from quillet.corpus.sources import Columns, Unit, read
from quillet.tarvex import _host

MANIFEST = "manifest.json"
_FORMAT = 1
_SUMMARY_KEY = "quillet.summary"
# Bytes of source that a shard holds, nearly.
_SHARD_BYTES = 64 << 20
# Rows that are sorted at once, and those of a row group.
_RUN_ROWS = 200_000
_GROUP_ROWS = 25_000


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
    started = time.process_time()
    with (
        _beside(plan.path_of(shard)) as records_path,
        _beside(plan.path_of(shard, "files")) as files_path,
        open(records_path, "wb") as records,
        open(files_path, "wb") as files,
    ):
        writer = _host.ShardWriter(
            languages_of(plan.version),
            plan.form == "occurrences",
            decode_source,
            _compressor(),
            _RUN_ROWS,
            _GROUP_ROWS,
        )
        for unit in plan.shards[shard]:
            for row in read(Unit(*unit), plan.columns):
                if writer.Add(*row):
                    records.write(writer.TakeRows())
                    files.write(writer.TakeFiles())
        writer.WorkToTheEnd()
        summary = Summary(*writer.Totals(), round(time.process_time() - started, 3), _most_megabytes())
        writer.Finish(_SUMMARY_KEY, json.dumps(summary))
        records.write(writer.TakeRows())
        files.write(writer.TakeFiles())
    return summary


def _compressor() -> Any:
    """What compresses a page."""
    try:
        import zstandard
    except ImportError:
        import pyarrow

        # What this works with is made anew for each page.
        return pyarrow.Codec("zstd", compression_level=1).compress
    return zstandard.ZstdCompressor(level=1).compress


def task_of(plan: Plan, shard: int) -> tuple[Plan, int]:
    """The arguments of `run_shard` with the units of this shard alone, to be sent to a worker."""
    shards: list[list[Unit]] = [[]] * shard
    return plan._replace(shards=[*shards, plan.shards[shard]]), shard


def summary_of(plan: Plan, shard: int) -> Summary:
    """What became of a shard that is complete."""
    from pyarrow import parquet

    return Summary(*json.loads(parquet.read_metadata(plan.path_of(shard)).metadata[_SUMMARY_KEY.encode()]))


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


# ---- files ----

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
