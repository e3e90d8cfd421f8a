"""Brings an index up to date with the files on disk.

A file whose size and time of change are as they were is not opened; one whose content has the hash that
it had is not analysed. Files below the folders of the run that are gone leave the index. The trap: a file
may be written again within the clock's grain, so a time that is too young to trust is not kept; and size
and time are taken before the content, so that a change between the two is seen by the next run.
"""

from __future__ import annotations

import os
import sys
import time
from collections.abc import Callable, Iterable, Iterator
from contextlib import suppress
from typing import Any, NamedTuple

from quillet._languages import available_cores, decode_source, native_language_of
from quillet.cli.files import pipe_problem, problem_of, walk
from quillet.index.git import keep_out_of_git
from quillet.index.paths import full_path, is_below, prefix_of, stored_path, trusted_roots
from quillet.index.store import IndexProblem, StaleIndex, Stored, read_index, settings_text
from quillet.index.store import Settings as StoredSettings
from quillet.index.writing import check_place, engine_mark, write_index, write_lock
from quillet.tarvex import _host

# A change within this time of the last one could leave size and time as they are.
_GRAIN_NS = 2_000_000_000
_UNTRUSTED = -1


class Settings(NamedTuple):
    """What a run is asked to do. Without paths it brings up to date what earlier runs named."""

    paths: tuple[str, ...]
    version: tuple[int, int] | None = None
    jobs: int | None = None
    gitignore: bool | None = None
    force: bool = False
    exclude: tuple[str, ...] = ()  # without any, those of the last run


class Watched(NamedTuple):
    """The files that a run looks at, as `find_files` takes them."""

    paths: tuple[str, ...]
    gitignore: bool
    exclude: tuple[str, ...]


class Outcome(NamedTuple):
    """What a run did."""

    files: int
    analysed: int
    removed: int
    unread: int
    records: int


class Reports(NamedTuple):
    """What a run calls while it goes on.

    `unread` gets a file and the reason why it was not read; `waiting` is called when another run writes;
    `note` gets a line about the index itself; `begin` gets the number of files that are to be analysed, and
    `advance` is called behind each of them.
    """

    unread: Callable[[str, str], None]
    waiting: Callable[[], None]
    note: Callable[[str], None]
    begin: Callable[[int], None]
    advance: Callable[[], None]


# A file that is there: path, path as stored, size and time. A plain tuple, since there may be many.
_Candidate = tuple[bytes, bytes, int, int]


def update(index: str, settings: Settings, reports: Reports) -> Outcome:
    """Brings the index up to date and returns what was done. Raises `IndexProblem`."""
    check_place(index)
    index = os.path.abspath(index)
    with write_lock(index, reports.waiting):
        return _Run(index, settings, reports).run()


def watched_files(index: str, settings: Settings) -> Watched:
    """What a run with these settings looks at."""
    base = os.path.dirname(os.path.abspath(index))
    remembered = read_index(index).settings
    paths = settings.paths or trusted_roots(remembered.roots, base)[0]
    return Watched(paths, remembered.gitignore, remembered.exclude)


class _Run:
    def __init__(self, index: str, settings: Settings, reports: Reports) -> None:
        self._index = index
        self._base = os.path.dirname(index)
        self._reports = reports
        self._unread = 0
        self._stored = self._read()
        remembered = self._stored.settings if self._stored is not None else None

        if remembered is None and not settings.paths:
            raise IndexProblem("nothing was indexed yet; name what to index: quillet index PATH...")
        inside, outside = trusted_roots(remembered.roots, self._base) if remembered else ((), ())
        for root in outside if not settings.paths else ():
            reports.note(f"{root}: lies outside the index's folder; name it to bring it up to date")
        self._paths = settings.paths or inside
        self._gitignore = settings.gitignore
        if self._gitignore is None:
            self._gitignore = remembered is None or remembered.gitignore
        self._exclude = settings.exclude or (remembered.exclude if remembered else ())
        self._version = settings.version or (remembered.python if remembered else sys.version_info[:2])
        self._jobs = settings.jobs or available_cores()

        named = [os.path.abspath(path) for path in settings.paths]
        roots = [root for root in dict.fromkeys([*inside, *outside, *named]) if os.path.exists(root)]
        kept = tuple(os.fsdecode(stored_path(root, self._base)) for root in roots)
        self._settings = StoredSettings(kept, self._version, self._gitignore, engine_mark(), self._exclude)
        # What another engine found, or this one in another language, is found again, wherever it lies.
        self._anew = settings.force or (
            remembered is not None
            and (remembered.python, remembered.made_by) != (self._version, self._settings.made_by)
        )

    def _read(self) -> Stored | None:
        """The index as it is, None where it is to be made anew."""
        if not os.path.exists(self._index):
            return None
        try:
            return read_index(self._index)
        except StaleIndex as problem:
            self._reports.note(str(problem).partition(";")[0] + "; it is made anew")
            return None

    def run(self) -> Outcome:
        rows = self._stored.native.Files() if self._stored is not None else []
        known = {row[1]: row for row in rows}
        changed: list[_Candidate] = []
        kept: list[tuple[int, int, int]] = []  # number, size and time
        is_same = self._stored is not None and self._stored.native.settings == settings_text(self._settings)
        records = 0
        for candidate in self._candidates():
            path, stored, size, mtime_ns = candidate
            row = known.pop(stored, None)
            if row is None or self._anew:
                changed.append(candidate)
                continue
            if row[2] == size and row[3] == mtime_ns != _UNTRUSTED:
                pass
            elif self._has_its_content(path, size, row):
                is_same = is_same and row[3] == mtime_ns
            else:
                changed.append(candidate)
                continue
            kept.append((row[0], size, mtime_ns))
            records += row[6]
            if row[8] is not None:
                self._report(os.fsdecode(path), row[8])
        gone = set(self._gone(known))
        for stored, row in known.items():
            if stored in gone:
                continue
            # A file elsewhere stays as it is, unless nothing does.
            if self._anew:
                changed.append((os.fsencode(full_path(stored, self._base)), stored, row[2], _UNTRUSTED))
            else:
                kept.append((row[0], row[2], row[3]))
                records += row[6]

        if changed or gone or not is_same:
            writer = _host.NameIndexWriter()
            if self._stored is not None:
                writer.KeepAll(self._stored.native, kept)
            records += self._analyse(changed, writer)
            keep_out_of_git(self._index)
            write_index(self._index, writer, self._settings)
        return Outcome(len(kept) + len(changed), len(changed), len(gone), self._unread, records)

    def _report(self, path: str, problem: str) -> None:
        self._unread += 1
        self._reports.unread(path, problem)

    def _candidates(self) -> Iterator[_Candidate]:
        """The files that are there."""
        prefixes = [prefix_of(path, self._base) for path in self._paths]
        seen: set[bytes] = set()
        now = time.time_ns()
        walked = walk(self._paths, gitignore=bool(self._gitignore), exclude=self._exclude)
        for path, problem, argument, below, size, mtime_ns in walked:
            if problem is not None:
                self._report(os.fsdecode(path), problem)
                continue
            if below:
                stored = prefixes[argument] + path[below:]
            else:
                name = os.fsdecode(path)
                try:
                    status = os.stat(name)
                except (OSError, ValueError) as error:  # such as a NUL in the name
                    self._report(name, problem_of(error))
                    continue
                if problem := pipe_problem(status.st_mode):
                    self._report(name, problem)
                    continue
                size, mtime_ns = status.st_size, status.st_mtime_ns
                stored = stored_path(name, self._base)
            if stored not in seen:
                seen.add(stored)
                trusted = now - mtime_ns > _GRAIN_NS
                yield path, stored, size, mtime_ns if trusted else _UNTRUSTED

    def _has_its_content(self, path: bytes, size: int, row: tuple[Any, ...]) -> bool:
        """Whether a file is what a row of the index says, whatever its time."""
        if row[8] is not None or size != row[2]:
            return False
        with suppress(OSError), open(path, "rb") as file:
            return bool(_host.HashOfSource(file.read()) == row[4])
        return False

    def _gone(self, unseen: Iterable[bytes]) -> Iterator[bytes]:
        """Of the files that were not seen, those below the folders of the run."""
        roots = [os.path.abspath(path) for path in self._paths]
        for stored in unseen:
            path = full_path(stored, self._base)
            if any(is_below(path, root) for root in roots):
                yield stored

    def _analyse(self, files: list[_Candidate], writer: _host.NameIndexWriter) -> int:
        """Adds files and returns the number of their records."""
        records = 0
        inputs = [(path, None, None) for path, _, _, _ in files]
        self._reports.begin(len(files))
        language = native_language_of(self._version)
        batch = _host.Batch(language, inputs, self._jobs, decode_source, _host.WordsFormat(), False)
        try:
            while (result := batch.Next()) is not None:
                path, stored, size, mtime_ns = files[result.index]
                problem = result.problem
                if problem is not None:
                    self._report(os.fsdecode(path), problem)
                errors = len(result.errors) + len(result.reports)
                # A file that could not be read, or is another one by now, is looked at again next time.
                if result.byte_count != size:
                    mtime_ns = _UNTRUSTED
                records += writer.Add(stored, size, mtime_ns, result.line_count, errors, problem, result)
                self._reports.advance()
        finally:
            batch.Cancel()
        return records
