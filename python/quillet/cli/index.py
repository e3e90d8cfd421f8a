"""`quillet index`: brings an index up to date, once or until interrupted."""

from __future__ import annotations

import os
import sys
import time

from quillet.cli.files import find_files
from quillet.cli.show import printable
from quillet.index.store import DEFAULT_NAME, IndexProblem, find_index
from quillet.index.update import Outcome, Reports, Settings, update

# How often the watch looks at the files, in seconds.
_INTERVAL = 0.5


def run(settings: Settings, *, output: str | None, form: str, watch: bool, quiet: bool) -> int:
    """Runs the command and returns its exit code."""
    if "-" in settings.paths:
        print("quillet: standard input has no place in an index; name files or folders", file=sys.stderr)
        return 2
    try:
        if form == "parquet":
            return _parquet(settings, output or "quillet.parquet", quiet=quiet)
        index = output or (DEFAULT_NAME if settings.paths else find_index())
        outcome = _update(index, settings, quiet=quiet)
        if watch:
            _watch(index, settings, quiet=quiet)
    except IndexProblem as problem:
        print(f"quillet: {printable(str(problem))}", file=sys.stderr)
        return 1
    except KeyboardInterrupt:
        return 130
    return 1 if outcome.unread else 0


def _parquet(settings: Settings, target: str, *, quiet: bool) -> int:
    from quillet.index.parquet import write_parquet

    if not settings.paths:
        print("quillet: name what to index: quillet index PATH... --format parquet", file=sys.stderr)
        return 2
    start = time.perf_counter()
    outcome = write_parquet(settings, target, _reports(target))
    _tell(target, settings, outcome, time.perf_counter() - start, quiet=quiet)
    return 1 if outcome.unread else 0


def _update(index: str, settings: Settings, *, quiet: bool) -> Outcome:
    start = time.perf_counter()
    outcome = update(index, settings, _reports(index))
    _tell(index, settings, outcome, time.perf_counter() - start, quiet=quiet)
    return outcome


def _reports(target: str) -> Reports:
    return Reports(unread=_say_unread, waiting=lambda: _say_waiting(target))


def _tell(target: str, settings: Settings, outcome: Outcome, spent: float, *, quiet: bool) -> None:
    """Says what a run did."""
    if not quiet:
        parts = [f"{outcome.files} files", f"{outcome.records} records", f"{outcome.analysed} analysed"]
        if outcome.removed:
            parts.append(f"{outcome.removed} removed")
        print(f"quillet: {printable(target)}: {', '.join(parts)} in {spent:.2f} s", file=sys.stderr)
        if outcome.files == 0 and not outcome.unread:
            named = " ".join(printable(path) for path in settings.paths) or "."
            print(f"quillet: {named}: there are no Python files; name a folder that holds some", file=sys.stderr)
    if outcome.unread:
        noun = "file" if outcome.unread == 1 else "files"
        print(f"quillet: {outcome.unread} {noun} could not be read", file=sys.stderr)


def _say_unread(path: str, problem: str) -> None:
    print(f"quillet: {printable(path)}: {printable(problem)}", file=sys.stderr)


def _say_waiting(index: str) -> None:
    print(f"quillet: {printable(index)}: another run is writing it; waiting for its end", file=sys.stderr)


def _watch(index: str, settings: Settings, *, quiet: bool) -> None:
    """Updates the index whenever a file came, went or changed; ends by an interrupt."""
    from quillet.index.update import watched_paths

    paths, gitignore = watched_paths(index, settings)
    before = _look(paths, gitignore)
    while True:
        time.sleep(_INTERVAL)
        now = _look(paths, gitignore)
        if now != before:
            _update(index, settings, quiet=quiet)
            before = now


def _look(paths: tuple[str, ...], gitignore: bool) -> dict[str, tuple[int, int, int]]:
    """Each file that is there, by what tells that it changed."""
    seen = {}
    for item in find_files(paths, gitignore=gitignore):
        try:
            status = os.stat(item.path)
        except (OSError, ValueError):
            continue
        seen[item.path] = (status.st_size, status.st_mtime_ns, status.st_ino)
    return seen
