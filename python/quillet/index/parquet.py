"""Writes the records of files as a Parquet file, by pyarrow where it is installed."""

from __future__ import annotations

import os
from typing import Any

from quillet._batch import FileAnalyses, analyze_files
from quillet.cli.files import find_files
from quillet.index.store import IndexProblem
from quillet.index.update import Outcome, Reports, Settings


def write_parquet(settings: Settings, target: str, reports: Reports) -> Outcome:
    """Analyses files and writes their records, a row group some files, as columns all the way.

    A file with this name is replaced when everything is written. Raises `IndexProblem`, also where
    pyarrow is not installed.
    """
    pyarrow = _load_pyarrow()
    unread = 0
    paths: list[str] = []
    for item in find_files(settings.paths, gitignore=settings.gitignore is not False):
        if item.problem is None:
            paths.append(item.path)
        else:
            reports.unread(item.path, item.problem)
            unread += 1
    paths = list(dict.fromkeys(map(os.path.relpath, paths)))
    unfinished = f"{target}.part"
    try:
        with analyze_files(paths, version=settings.version, jobs=settings.jobs) as analyses:
            records = _write(pyarrow, analyses, unfinished)
            problems = analyses.problems
        os.replace(unfinished, target)
    except OSError as error:
        raise IndexProblem(f"{target}: {error.strerror or error}") from error
    except pyarrow.ArrowException as error:
        raise IndexProblem(f"{target}: {error}") from error
    finally:
        if os.path.exists(unfinished):
            os.unlink(unfinished)
    for path, problem in problems:
        reports.unread(path, problem)
    return Outcome(len(paths), len(paths) - len(problems), 0, unread + len(problems), records)


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
