"""`quillet export`: what the files of an index say, as a tags file, as SCIP, as JSON lines or as tables."""

from __future__ import annotations

import os
import sys
import tempfile
from collections.abc import Iterator, Sequence

from quillet.cli.find import fail, say_outside
from quillet.cli.show import printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import Index
from quillet.index.store import IndexProblem, find_index

_NAMES = {
    "tags": "tags",
    "scip": "index.scip",
    "jsonl": "-",
    "sqlite": "quillet.sqlite",
    "parquet": "quillet.parquet",
}
# What only a file can hold.
_TABLES = ("sqlite", "parquet")


def run(form: str, *, output: str | None, index: str | None, roots: Sequence[str]) -> int:
    """Runs the command and returns its exit code."""
    target = output or _NAMES[form]
    try:
        with Index(index or find_index(), roots) as opened:
            opened.files()
            say_outside(opened)
            if form in _TABLES:
                return _write_tables(opened, form, target)
            base = os.getcwd() if target == "-" else os.path.dirname(os.path.abspath(target))
            parts = _parts(opened, form, base)
            if target == "-":
                with quiet_output() as out:
                    for part in parts:
                        out.flush()
                        out.buffer.write(part)
            else:
                _write(target, parts)
    except IndexProblem as problem:
        return fail(problem)
    except OSError as error:
        if target == "-":
            raise
        print(f"quillet: {printable(target)}: {error.strerror or error}", file=sys.stderr)
        return 2
    return 0


def _write_tables(index: Index, form: str, target: str) -> int:
    from quillet.index.tables import Source, write_sqlite

    if target == "-":
        return fail(ValueError(f"{form} is written to a file; name one with -o"))
    rows = index.files()
    # As a person would name them, since that is how columns of a path are read.
    paths = [index.shown_path(row.path) for row in rows]
    source = Source(paths, [row.path for row in rows], index.version or sys.version_info[:2])
    if form == "parquet":
        from quillet.index.parquet import write_parquet

        outcome = write_parquet(source, target)
    else:
        outcome = write_sqlite(source, target)
    for path, problem in outcome.problems:
        print(f"quillet: {printable(path)}: {printable(problem)}", file=sys.stderr)
    return 0


def _parts(index: Index, form: str, base: str) -> Iterator[bytes]:
    if form == "tags":
        from quillet.index.tags import tag_lines

        yield from (line + b"\n" for line in tag_lines(index, base))
    elif form == "scip":
        from quillet import __version__
        from quillet.index.scip import scip_parts

        yield from scip_parts(index, index.base, __version__, _say_skipped)
    else:
        from quillet.index.jsonl import json_lines

        yield from (line.encode("ascii") + b"\n" for line in json_lines(index, base))


def _say_skipped(path: str) -> None:
    print(f"quillet: {printable(path)}: left out, as it lies outside the index's folder", file=sys.stderr)


def _write(target: str, parts: Iterator[bytes]) -> None:
    """Writes a file beside the target and puts it in its place, so that nobody reads half of one."""
    folder = os.path.dirname(os.path.abspath(target))
    handle, path = tempfile.mkstemp(prefix=".quillet-", dir=folder)
    try:
        with os.fdopen(handle, "wb") as file:
            file.writelines(parts)
        umask = os.umask(0)
        os.umask(umask)
        os.chmod(path, 0o666 & ~umask)
        os.replace(path, target)
    except BaseException:
        os.unlink(path)
        raise
