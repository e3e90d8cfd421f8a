"""`quillet index`: brings an index up to date, once or until interrupted."""

from __future__ import annotations

import os
import sys
import time
from collections.abc import Iterator
from typing import TYPE_CHECKING

from quillet.cli.files import find_files
from quillet.cli.progress import Progress, say
from quillet.cli.show import printable
from quillet.index.paths import stored_path
from quillet.index.store import DEFAULT_NAME, IndexProblem, find_index
from quillet.index.update import Outcome, Reports, Settings, update

if TYPE_CHECKING:
    from quillet.index.update import Watched

# How often the watch looks at the files where nobody tells of changes, in seconds, and where somebody
# does, in milliseconds: some file systems tell of nothing.
_INTERVAL = 2.0
_RARE_LOOK_MS = 30_000


def run(settings: Settings, *, output: str | None, form: str, watch: bool, quiet: bool) -> int:
    """Runs the command and returns its exit code."""
    if "-" in settings.paths:
        print("quillet: standard input has no place in an index; name files or folders", file=sys.stderr)
        return 2
    try:
        if form != "index":
            return _tables(settings, form, output or f"quillet.{form}", quiet=quiet)
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


def _tables(settings: Settings, form: str, target: str, *, quiet: bool) -> int:
    from quillet.index.tables import Source, write_sqlite

    if not settings.paths:
        print(f"quillet: name what to analyse: quillet index PATH... --format {form}", file=sys.stderr)
        return 2
    start = time.perf_counter()
    found: list[str] = []
    unread = 0
    for item in find_files(settings.paths, gitignore=settings.gitignore is not False, exclude=settings.exclude):
        if item.problem is None:
            found.append(os.path.relpath(item.path))
        else:
            _say_unread(item.path, item.problem)
            unread += 1
    paths = sorted(set(found))
    base = os.path.dirname(os.path.abspath(target))
    stored = [stored_path(path, base) for path in paths]
    source = Source(paths, stored, settings.version or sys.version_info[:2], settings.jobs)
    if form == "parquet":
        from quillet.index.parquet import write_parquet

        written = write_parquet(source, target)
    else:
        written = write_sqlite(source, target)
    for path, problem in written.problems:
        _say_unread(path, problem)
    unread += len(written.problems)
    outcome = Outcome(written.files, written.files - len(written.problems), 0, unread, written.records)
    _tell(target, settings, outcome, time.perf_counter() - start, quiet=quiet)
    return 1 if unread else 0


def _update(index: str, settings: Settings, *, quiet: bool) -> Outcome:
    start = time.perf_counter()
    with Progress("indexing", wanted=not quiet) as progress:
        reports = Reports(
            unread=_say_unread,
            waiting=lambda: say(f"{printable(index)}: another run is writing it; waiting for its end"),
            note=lambda text: say(printable(text)),
            begin=lambda count: progress.begin("indexing", count),
            advance=progress.advance,
        )
        outcome = update(index, settings, reports)
    _tell(index, settings, outcome, time.perf_counter() - start, quiet=quiet)
    return outcome


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
    say(f"{printable(path)}: {printable(problem)}")


def _watch(index: str, settings: Settings, *, quiet: bool) -> None:
    """Updates the index whenever a file came, went or changed; ends by an interrupt."""
    from quillet.index.update import watched_files

    watched = watched_files(index, settings)
    before = _look(watched)
    for _ in _moments(watched.paths):
        now = _look(watched)
        if now != before:
            _update(index, settings, quiet=quiet)
            before = now


def _moments(paths: tuple[str, ...]) -> Iterator[object]:
    """The moments at which something may have changed: those that the system tells, or else many."""
    try:
        from watchfiles import watch
    except ImportError:
        say(f"looks at all files every {_INTERVAL:g} s; to be told of changes: pip install watchfiles")
        while True:
            time.sleep(_INTERVAL)
            yield None
    # Editors put a new file in the place of an old one, which its folder tells.
    folders = {path if os.path.isdir(path) else os.path.dirname(path) or "." for path in paths}
    # What changed between the first look and the begin of the watch is seen by the next rare look.
    yield from watch(
        *sorted(folders), watch_filter=None, raise_interrupt=True, yield_on_timeout=True, rust_timeout=_RARE_LOOK_MS
    )


def _look(watched: Watched) -> dict[str, tuple[int, int, int]]:
    """Each file that is there, by what tells that it changed."""
    seen = {}
    for item in find_files(watched.paths, gitignore=watched.gitignore, exclude=watched.exclude):
        try:
            status = os.stat(item.path)
        except (OSError, ValueError):
            continue
        seen[item.path] = (status.st_size, status.st_mtime_ns, status.st_ino)
    return seen
