"""Asks for names: where is one set, read, called, imported, and what does a function return.

Answers are found by analysing files as they are now. An index only says which files may hold one; a file
that changed since it was made is analysed whatever it says. So an answer is never of yesterday, and never
of a file that the index should not know of: what lies outside its folder is left out unless the caller
names the folder.
"""

from __future__ import annotations

import os
from collections.abc import Iterable, Iterator, Sequence
from typing import NamedTuple

from quillet.index.paths import Places, StoredPaths, stored_path
from quillet.index.store import CLASS, FUNCTION, KINDS, read_index
from quillet.tarvex import _host

_USES: dict[str, int] = _host.USES


def _uses(records: str, occurrences: str = "") -> int:
    """The bits of what records and occurrences say of a name."""
    found = 0
    for word in records.split():
        found |= _USES[word]
    for word in occurrences.split():
        found |= _host.ROLE_USES[word]
    return found


# What the options of `quillet find` ask for.
ROLES = {
    "set": _uses("set within_expr", "definition write"),
    "get": _uses("get", "read call"),
    "call": _uses("called", "call"),
    "import": _uses("import from_import import_as", "import"),
    "param": _uses("parameter"),
    "hint": _uses("hint"),
    "def": _uses("define"),
    "delete": _uses("", "delete"),
    "keyword": _uses("", "keyword"),
    "decorator": _uses("decorator"),
    "base": _uses("base"),
    "raise": _uses("raise"),
    "annotation": _uses("annotation"),
}
_ALL_USES = _USES["all"]
# Where an occurrence stands, by the bits of `Hit.flags`.
FLAGS: tuple[str, ...] = _host.NAME_FLAG_WORDS
# A thread of its own is worth while for so much source.
_BYTES_A_THREAD = 1 << 19


class Hit(NamedTuple):
    """A record or an occurrence that answers a question. `path` is as stored; lines and columns count from 1.

    `kind` is that of the record, and of an occurrence that no record tells of the kind of the record that
    would, or its role. `role` is None where there is no occurrence of the name.
    """

    path: bytes
    line: int
    column: int
    scope: str
    name: str
    kind: str
    detail: str
    is_parameter: bool
    opens: int
    role: str | None
    flags: int


class FileRow(NamedTuple):
    """What is known of a file without a look at it. Without an index, only its path and size."""

    number: int
    path: bytes
    size: int
    mtime_ns: int
    hash: int
    lines: int
    records: int
    errors: int
    problem: str | None


class Query(NamedTuple):
    """A question for a name. `match` is exact, suffix or glob; no roles means all of them."""

    name: str
    match: str
    roles: tuple[str, ...] = ()
    returns: bool = False
    scope: str | None = None
    path: str | None = None

    def native(self, *, with_lines: bool = False) -> _host.Question:
        uses = 0
        for role in self.roles:
            uses |= ROLES[role]
        if not self.roles and not self.returns:
            uses = _ALL_USES
        return _host.MakeQuestion(self.match, self.name, uses, self.returns, self.scope, with_lines)


class FileFacts(NamedTuple):
    """What a file says as it is now. `problem` says why it could not be analysed."""

    row: FileRow
    hits: list[Hit]
    source_lines: list[bytes]  # of the hits, where they were asked for
    errors: list[tuple[int, int, str]]
    lines: int
    problem: str | None


class Counts(NamedTuple):
    """Totals of files as they are now. `kinds` and `names` are the most frequent ones first."""

    files: int
    lines: int
    records: int
    errors: int
    kinds: list[tuple[str, int]]
    names: list[tuple[str, int]]


class Sources:
    """Files that can be asked. `version` is the Python that they are read as."""

    def __init__(self, base: str, version: tuple[int, int] | None) -> None:
        self.base = base
        self.version = version
        self._working_folder = os.path.join(os.getcwd(), "")

    def files(self) -> list[FileRow]:
        """All files, by path."""
        raise NotImplementedError

    def candidates(self, question: _host.Question, /) -> list[FileRow]:
        """The files that may answer."""
        raise NotImplementedError

    def words_alike(self, word: str, /) -> list[str]:
        """Words of the files that differ from one by the case of letters alone, as far as they are known."""
        raise NotImplementedError

    def full_path(self, stored: bytes) -> str:
        """The absolute path of a file."""
        return os.path.join(self.base, os.fsdecode(stored))

    def shown_path(self, stored: bytes) -> str:
        """A file's path for people: from the working folder where it lies below it."""
        return self.full_path(stored).removeprefix(self._working_folder)

    # ---- names ----

    def find(self, query: Query) -> Iterator[Hit]:
        """The records that a question asks for, by path, line and column, as they are found."""
        for facts in self.answers(query):
            yield from facts.hits

    def answers(self, query: Query, *, with_lines: bool = False) -> Iterator[FileFacts]:
        """The same a file, with the files that hold an answer alone."""
        question = query.native(with_lines=with_lines)
        rows = self.candidates(question)
        if query.path is not None:
            rows = [row for row in rows if is_like(self.shown_path(row.path), query.path)]
        for facts in self.facts(rows, question):
            if facts.hits:
                yield facts

    def facts(self, rows: list[FileRow], question: _host.Question | None = None) -> Iterator[FileFacts]:
        """What files say, one after the other, in their order: all records, or those that answer."""
        for row, result in self.analysed(rows, question or self.everything()):
            problem = result.problem
            hits, lines = ([], []) if problem is not None else _host.Answers(result, row.path, KINDS)
            errors = sorted([*result.errors, *result.reports])
            yield FileFacts(row, list(map(Hit._make, hits)), lines, errors, result.line_count, problem)

    @staticmethod
    def everything(*, with_lines: bool = False) -> _host.Question:
        """The question that all records of a file answer."""
        return _host.MakeQuestion("everything", "", _ALL_USES, False, None, with_lines)

    def analysed(self, rows: list[FileRow], form: _host.Format) -> Iterator[tuple[FileRow, _host.FileResult]]:
        """What a format writes of files, on as many threads as they are worth."""
        from quillet._languages import available_cores, decode_source, native_language_of

        if not rows:
            return
        inputs = [(os.fsencode(self.full_path(row.path)), None, None) for row in rows]
        jobs = min(available_cores(), 1 + sum(row.size for row in rows) // _BYTES_A_THREAD)
        batch = _host.Batch(native_language_of(self.version), inputs, jobs, decode_source, form, False)
        try:
            while (result := batch.Next()) is not None:
                yield rows[result.index], result
        finally:
            batch.Cancel()

    # ---- files ----

    def facts_of(self, row: FileRow) -> FileFacts:
        """What one file says."""
        [facts] = self.facts([row])
        return facts

    def records_of(self, row: FileRow) -> list[Hit]:
        """All records of a file, in the order in which they were found."""
        return self.facts_of(row).hits

    def errors_of(self, row: FileRow) -> list[tuple[int, int, str]]:
        """The syntax errors of a file as line, column and message."""
        return self.facts_of(row).errors


class Index(Sources):
    """An open index, to be asked for files of its folder and of `roots`. Raises `IndexProblem`.

    What fits `exclude`, lines of a .gitignore file in its folder, is no candidate.
    """

    def __init__(self, path: str, roots: Iterable[str] = (), *, exclude: Sequence[str] = ()) -> None:
        self.path = os.path.abspath(path)
        stored = read_index(path)
        super().__init__(os.path.dirname(self.path), stored.settings.python)
        self._native = stored.native
        self._places = Places(self.base, roots)
        self._exclude = exclude
        self._files: list[FileRow] | None = None
        self.outside = 0

    def __enter__(self) -> Index:
        return self

    def __exit__(self, *_: object) -> None:
        pass

    def files(self) -> list[FileRow]:
        """All files that may be shown, by path. `outside` counts the others behind it."""
        if self._files is None:
            rows = list(map(FileRow._make, self._native.Files()))
            self._files = [row for row in rows if self._places.path_of(row.path) is not None]
            self.outside = len(rows) - len(self._files)
        return [row for row in self._files if self._places.holds(self.full_path(row.path))]

    def candidates(self, question: _host.Question, /) -> list[FileRow]:
        self.files()
        wanted = set(self._native.FilesFor(question))
        found = []
        for row in self._files or ():
            path = self.full_path(row.path)
            try:
                status = os.stat(path)
            except OSError:
                continue  # gone since
            if row.number not in wanted and is_as_known(path, status, row):
                continue
            if self._places.holds(path):
                found.append(row._replace(size=status.st_size))
        if self._exclude:
            from quillet.cli.files import Exclusion

            exclusion = Exclusion(self._exclude)
            found = [row for row in found if not exclusion.excludes(row.path.lstrip(b"/"))]
        return found

    def words_alike(self, word: str, /) -> list[str]:
        return self._native.WordsAlike(word)

    def file(self, path: str) -> FileRow | None:
        """A file by a path as a person names it, or None where the index does not have it."""
        stored = stored_path(path, self.base)
        return next((row for row in self.files() if row.path == stored), None)

    def errors(self) -> int:
        """The number of syntax errors when the index was made."""
        return sum(row.errors for row in self.files())

    def counts(self) -> dict[str, int]:
        """Totals of files, lines and records when the index was made."""
        rows = self.files()
        return {
            "files": len(rows),
            "lines": sum(row.lines for row in rows),
            "records": sum(row.records for row in rows),
        }

    def counts_now(self, names: int) -> Counts:
        """Totals of the files as they are now, with so many of the names that most records are of."""
        sums = _host.RecordCounts()
        files = lines = errors = 0
        for _, result in self.analysed(self.files(), _host.CountsFormat()):
            files += 1
            if result.problem is None:
                lines += result.line_count
                errors += len(result.errors) + len(result.reports)
                sums.Add(result)
        kinds = [(kind, count) for kind, count in zip(KINDS, sums.kinds, strict=True) if count]
        kinds.sort(key=lambda pair: -pair[1])
        return Counts(files, lines, sum(sums.kinds), errors, kinds, sums.MostUsed(names))

    def python(self) -> str:
        """The version of Python that files are read as."""
        return "{}.{}".format(*self.version or ())


class Folder(Sources):
    """The files of a folder, without an index; `exclude` as in `find_files`."""

    def __init__(self, path: str, version: tuple[int, int] | None = None, *, exclude: Sequence[str] = ()) -> None:
        super().__init__(os.path.abspath(path), version)
        self._path = path
        self._exclude = exclude

    def files(self) -> list[FileRow]:
        from quillet.cli.files import find_files

        stored = StoredPaths(self.base)
        sizes = {}
        for item in find_files((self._path,), gitignore=True, exclude=self._exclude):
            if item.problem is None:
                try:
                    sizes[stored(item.path)] = os.stat(item.path).st_size
                except (OSError, ValueError):
                    continue
        return [row_of(path, sizes[path], number) for number, path in enumerate(sorted(sizes))]

    def candidates(self, _: _host.Question, /) -> list[FileRow]:
        return self.files()

    def words_alike(self, _: str, /) -> list[str]:
        return []


def row_of(path: bytes, size: int = 0, number: int = 0) -> FileRow:
    """A file of which nothing is known but that it is there."""
    return FileRow(number, path, size, 0, 0, 0, 0, 0, None)


def is_as_known(path: str, status: os.stat_result, row: FileRow) -> bool:
    """Whether a file's content is what it was: by size and time, and for another time by its hash."""
    if row.size != status.st_size:
        return False
    if row.mtime_ns == status.st_mtime_ns:
        return True
    try:
        with open(path, "rb") as file:
            return _host.HashOfSource(file.read()) == row.hash
    except OSError:
        return False


def is_like(path: str, pattern: str) -> bool:
    """Whether a path, or the end of it from a separator on, fits a pattern."""
    from fnmatch import fnmatchcase

    path = path.replace(os.sep, "/")
    return fnmatchcase(path, pattern) or fnmatchcase(path, f"*/{pattern}")


def definitions_in(hits: Iterable[Hit], *, imports: bool = False) -> list[Hit]:
    """What a file defines, out of its records: its classes and functions, and the names set in its module
    and classes; names that an import binds are another file's, and come with `imports`.
    """
    hits = list(hits)
    imported = {} if imports else imports_in(hits)
    inside = {""}
    found = []
    for hit in hits:
        if hit.opens == CLASS:
            inside.add(f"{hit.scope}.{hit.name}" if hit.scope else hit.name)
        if hit.kind != "set" or hit.is_parameter or (hit.line, hit.column) in imported:
            continue
        if hit.opens in (CLASS, FUNCTION) or hit.scope in inside:
            found.append(hit)
    return found


def imports_in(hits: Iterable[Hit]) -> dict[tuple[int, int], str]:
    """The places where an import binds a name, by line and column, and whether it names a module or what is in
    one: "import" or "from_import".
    """
    return {(hit.line, hit.column): hit.kind for hit in hits if hit.kind in ("import", "from_import")}


def match_of(name: str) -> str:
    """How a name is meant: ".attr" as a suffix, one with * or ? as a pattern, any other as it is."""
    if "*" in name or "?" in name:
        return "glob"
    return "suffix" if name.startswith(".") else "exact"
