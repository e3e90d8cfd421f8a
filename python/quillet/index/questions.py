"""Asks for names: where is one set, read, called, imported, and what does a function return.

Answers are found by analysing files as they are now. An index only says which files may hold one; a file that came
or changed since it was made is analysed whatever it says, and one that is gone or ignored by now is not. So an answer
is never of yesterday, and never of a file that the index should not know of: what lies outside its folder is left out
unless the caller names the folder.

Little is loaded here (no typing, no collections), since a question that one types has to be answered before
one notices.
"""

from __future__ import annotations

import os

from quillet.index.store import KINDS, read_index
from quillet.tarvex import _host

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterable, Iterator, Sequence
    from typing import Any

    from quillet.index.facts import Counts, FileFacts, FileRow, Hit

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
# What defines a name, and what hints say of it and of its parameters.
DEFINING_USES = _uses("set hint")
# Where an occurrence stands, by the bits of `Hit.flags`.
FLAGS: tuple[str, ...] = _host.NAME_FLAG_WORDS
# A thread of its own is worth while for so much source.
_BYTES_A_THREAD = 1 << 19


class Query:
    """A question for a name. `match` is exact, suffix or glob; no roles means all of them."""

    def __init__(
        self,
        name: str,
        match: str,
        roles: tuple[str, ...] = (),
        returns: bool = False,
        scope: str | None = None,
        path: str | None = None,
    ) -> None:
        self.name = name
        self.match = match
        self.roles = roles
        self.returns = returns
        self.scope = scope
        self.path = path

    def but(self, **changes: Any) -> Query:
        """The same question but for these parts."""
        return Query(**{**self.__dict__, **changes})

    def native(self) -> _host.Question:
        """The question as the core takes it."""
        uses = 0
        for role in self.roles:
            uses |= ROLES[role]
        if not self.roles and not self.returns:
            uses = _ALL_USES
        return _host.MakeQuestion(self.match, self.name, uses, self.returns, self.scope, False)


def roles_of(hit: Hit) -> Iterator[str]:
    """The roles, as `ROLES` has them, that may ask for an answer."""
    if hit.is_parameter:
        yield "param"
    if hit.opens:
        yield "def"
    yield from (word for i, word in enumerate(FLAGS) if hit.flags >> i & 1 and word in ROLES)
    uses = _USES.get(hit.kind, 0) | (_host.ROLE_USES[hit.role] if hit.role is not None else 0)
    yield from (role for role, asked in ROLES.items() if uses & asked)


# A file as the core has it: the fields of `FileRow`, of which these are looked at here.
_PATH = 1
_SIZE = 2


class Sources:
    """Files that can be asked. `version` is the Python that they are read as."""

    def __init__(self, base: str, version: tuple[int, int] | None) -> None:
        self.base = base
        self.version = version
        self._working_folder = os.path.join(os.getcwd(), "")

    def files(self) -> list[FileRow]:
        """All files, by path."""
        raise NotImplementedError

    def candidates(self, question: _host.Question, /) -> Sequence[tuple[Any, ...]]:
        """The files that may answer, each with the fields of a `FileRow`."""
        raise NotImplementedError

    def words_alike(self, pattern: str, /) -> list[str]:
        """Words of the files that differ from one, or from what fits a pattern of * and ?, by the case of letters
        alone, as far as they are known."""
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
        question = query.native()
        for facts in self.facts(self._asked(query, question), question):
            yield from facts.hits

    def lines(self, query: Query, form: str, *, colours: bool = False) -> Iterator[tuple[str, int, bytes]]:
        """The answers as they are shown: a file's path, how many places it has, and their lines.

        `form` is places, long or json, or none for who counts. Files without an answer are passed over.
        """
        question = query.native()
        native = _host.LinesFormat(question, form, colours, os.fsencode(self._working_folder))
        for row, result in self.analysed(self._asked(query, question), native):
            if result.problem is None:
                places, lines = _host.LinesOf(result)
                if places:
                    yield self.shown_path(row[_PATH]), places, lines

    def _asked(self, query: Query, question: _host.Question) -> Sequence[tuple[Any, ...]]:
        rows = self.candidates(question)
        if query.path is not None:
            rows = [row for row in rows if is_like(self.shown_path(row[_PATH]), query.path)]
        return rows

    def facts(self, rows: Iterable[tuple[Any, ...]], question: _host.Question | None = None) -> Iterator[FileFacts]:
        """What files say, one after the other, in their order: all records, or those that answer."""
        from quillet.index.facts import FileFacts, FileRow, Hit

        for row, result in self.analysed(rows, question or self.everything()):
            problem = result.problem
            hits, lines = ([], []) if problem is not None else _host.Answers(result, row[_PATH], KINDS)
            errors = sorted([*result.errors, *result.reports])
            found = list(map(Hit._make, hits))
            yield FileFacts(FileRow._make(row), found, lines, errors, result.line_count, problem)

    @staticmethod
    def everything(*, with_lines: bool = False, uses: int = _ALL_USES) -> _host.Question:
        """The question that all records of a file answer, or those that use a name in some ways."""
        return _host.MakeQuestion("everything", "", uses, False, None, with_lines)

    def analysed(
        self, rows: Iterable[tuple[Any, ...]], form: _host.Format
    ) -> Iterator[tuple[tuple[Any, ...], _host.FileResult]]:
        """What a format writes of files, on as many threads as they are worth."""
        from quillet._languages import available_cores, decode_source, native_language_of

        rows = list(rows)
        if not rows:
            return
        inputs = [(os.fsencode(self.full_path(row[_PATH])), None, None) for row in rows]
        jobs = min(available_cores(), 1 + sum(row[_SIZE] for row in rows) // _BYTES_A_THREAD)
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
        self._settings = stored.settings
        self._named = [os.path.abspath(root) for root in roots]
        self._places = _host.Places(os.fsencode(self.base), tuple(map(os.fsencode, self._named)))
        self._exclude = exclude
        self._walked: _host.CurrentFiles | None = None

    def __enter__(self) -> Index:
        return self

    def __exit__(self, *_: object) -> None:
        pass

    def files(self) -> list[FileRow]:
        """All files that may be shown, by path."""
        from quillet.index.facts import FileRow

        return list(map(FileRow._make, self._native.FilesIn(self._places)))

    @property
    def outside(self) -> int:
        """The number of files whose paths lead to where nothing may be shown."""
        return self._native.Outside(self._places)

    def candidates(self, question: _host.Question, /) -> Sequence[tuple[Any, ...]]:
        found: Sequence[tuple[Any, ...]] = self._native.CandidatesIn(question, self._current(), self._places)
        if self._exclude:
            from quillet.cli.files import Exclusion

            exclusion = Exclusion(self._exclude)
            found = [row for row in found if not exclusion.excludes(row[_PATH].lstrip(b"/"))]
        return found

    def _current(self) -> _host.CurrentFiles:
        """The files of the roots that may be shown, as they are at the first question."""
        if self._walked is None:
            from quillet.index.paths import is_below, pattern_lines, prefix_of, stored_path, trusted_roots

            inside, outside = trusted_roots(self._settings.roots, self.base)
            roots = [*inside, *(path for path in outside if any(is_below(path, root) for root in self._named))]
            stored = [
                prefix_of(path, self.base) if os.path.isdir(path) else stored_path(path, self.base) for path in roots
            ]
            pairs = list(zip(map(os.fsencode, roots), stored, strict=True))
            self._walked = _host.CurrentFiles(pairs, self._settings.gitignore, pattern_lines(self._settings.exclude))
        return self._walked

    def words_alike(self, pattern: str, /) -> list[str]:
        return self._native.WordsAlike(pattern)

    def file(self, path: str) -> FileRow | None:
        """A file by a path as a person names it, or None where the index does not have it."""
        from quillet.index.paths import stored_path

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
        from quillet.index.facts import Counts

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
        from quillet.cli.files import walk
        from quillet.index.facts import row_of

        walked = walk((self._path,), gitignore=True, exclude=self._exclude)
        sizes = {path[below:]: size for path, problem, _, below, size, _ in walked if below and problem is None}
        return [row_of(path, sizes[path], number) for number, path in enumerate(sorted(sizes))]

    def candidates(self, _: _host.Question, /) -> Sequence[tuple[Any, ...]]:
        return self.files()

    def words_alike(self, pattern: str, /) -> list[str]:
        import re

        pieces = re.split(rb"([*?])", pattern.encode())
        part = rb"[\w\x80-\xff]"
        parts = {b"*": part + b"*", b"?": part}
        alike = re.compile(
            b"(?<!%b)%b(?!%b)" % (part, b"".join(parts.get(piece) or re.escape(piece) for piece in pieces), part),
            re.IGNORECASE,
        )
        longest = max(pieces[::2], key=len).lower()
        found: set[bytes] = set()
        for row in self.files():
            try:
                with open(self.full_path(row.path), "rb") as file:
                    text = file.read()
            except OSError:
                continue  # the question said so
            if longest in text.lower():
                found.update(alike.findall(text))
        return sorted(each.decode(errors="replace") for each in found)


def is_like(path: str, pattern: str) -> bool:
    """Whether a path, or the end of it from a separator on, fits a pattern."""
    from fnmatch import fnmatchcase

    path = path.replace(os.sep, "/")
    return fnmatchcase(path, pattern) or fnmatchcase(path, f"*/{pattern}")


def match_of(name: str) -> str:
    """How a name is meant: ".attr" as a suffix, one with * or ? as a pattern, any other as it is."""
    if "*" in name or "?" in name:
        return "glob"
    return "suffix" if name.startswith(".") else "exact"
