"""Writes the records of files as a Parquet file, by pyarrow where it is installed."""

from __future__ import annotations

from typing import Any

from quillet._batch import FileAnalyses, analyze_files
from quillet.index.store import IndexProblem
from quillet.index.tables import Source, TablesOutcome, replacing


def write_parquet(source: Source, target: str) -> TablesOutcome:
    """Analyses files and writes their records, a row group some files, as columns all the way.

    A file with this name is replaced when everything is written. Raises `IndexProblem`, also where
    pyarrow is not installed.
    """
    pyarrow = _load_pyarrow()
    try:
        with (
            replacing(target) as unfinished,
            analyze_files(source.paths, version=source.version, jobs=source.jobs) as analyses,
        ):
            records = _write(pyarrow, analyses, unfinished)
            problems = analyses.problems
    except pyarrow.ArrowException as error:
        raise IndexProblem(f"{target}: {error}") from error
    return TablesOutcome(len(source.paths), records, problems)


def _write(pyarrow: Any, analyses: FileAnalyses, target: str) -> int:
    from pyarrow import parquet

    records = 0
    reader = pyarrow.RecordBatchReader.from_stream(analyses)
    with open(target, "wb") as file, parquet.ParquetWriter(file, reader.schema, compression="zstd") as writer:
        for batch in reader:
            writer.write_batch(batch)
            records += batch.num_rows
    return records


def _load_pyarrow() -> Any:
    try:
        import pyarrow
    except ImportError as error:
        raise IndexProblem("Parquet needs the package pyarrow; install it with: pip install pyarrow") from error
    return pyarrow
