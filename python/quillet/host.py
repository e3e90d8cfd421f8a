"""A whole source at once: bytes or text in, its statements and what each says of names out.

The source becomes UTF-8 (`_source`), and the core analyses all of it in one call. Nothing becomes a Python
object of its own before it is read: a `Line` is made when `Analysis.lines` is asked for it, its records
when `Line.records` is. The analyzers of those calls are the core's own. One that a host may look into
(`analyzer_for`) serves one thread, so each thread keeps one a version.
"""

from __future__ import annotations

import re
import threading
from collections.abc import Iterator, Sequence
from functools import cached_property
from typing import overload

from quillet._keywords import keywords_of
from quillet._languages import PY2_PRINT_FUNCTION_GRAMMAR, native_language_of
from quillet._languages import language_version as language_version
from quillet._records import KINDS, Record
from quillet._source import to_utf8
from quillet.tarvex import CPGenAnalyzerImpl, _host, kPy2DefaultGrammar, kPy3DefaultGrammar

_LINE_END = re.compile(rb"\r\n|\r|\n")
_BOM = b"\xef\xbb\xbf"


class _Analyzers(threading.local):
    def __init__(self) -> None:
        self.by_language: dict[tuple[tuple[int, int], bool], CPGenAnalyzerImpl] = {}


_analyzers = _Analyzers()


def analyzer_for(version: tuple[int, ...] | None = None, *, print_function: bool = False) -> CPGenAnalyzerImpl:
    """The calling thread's analyzer for a version, with the grammar and the keywords that belong to it.

    `print_function` is for sources that import it from `__future__`: in 2.7 they have no print
    statement. It is built at the first call and kept. Raises as `language_version` does.
    """
    language = language_version(version)
    python_3 = language >= (3, 0)
    print_function = print_function and not python_3
    analyzer = _analyzers.by_language.get((language, print_function))
    if analyzer is None:
        python_2_grammar = PY2_PRINT_FUNCTION_GRAMMAR if print_function else kPy2DefaultGrammar
        analyzer = CPGenAnalyzerImpl(
            (*language, 0),
            grammar_file=kPy3DefaultGrammar if python_3 else python_2_grammar,
            keyword_seq=keywords_of(language, print_function=print_function),
            py3_grammar=python_3,
        )
        _analyzers.by_language[language, print_function] = analyzer
    return analyzer


def analyze(
    source: bytes | bytearray | memoryview | str, *, version: tuple[int, ...] | None = None, exact: bool = False
) -> Analysis:
    """Analyses a source, statement by statement.

    `source` is the content of a file: bytes, read as their byte order mark or their PEP 263 line says and
    as UTF-8 without either, or text. `version` is the Python that it is written for, such as (2, 7) or
    (3, 12); None is the running interpreter's. Both grammars are served by any interpreter.

    Any content is analysed to its end: a bad statement has an `error` and no records, and the others are
    served. An error in a hint, or in what only Python's compiler rejects (a `return` outside of a function),
    leaves the statement its records. With `exact`, statements are read as `quillet.tarvex` reads them: by the
    grammars of 2.7 and 3.8 and what it adds to these, whatever the version has.

    Raises `SourceEncodingError` where the source names an encoding that cannot be used, `TypeError` and
    `ValueError` for wrong arguments.

    >>> for record in analyze("import os.path as p").lines[0].records:
    ...     print((record.name, record.kind.value, record.detail))
    ('p', 'set', '')
    ('p', 'import', 'os.path')
    ('p', 'import_as', 'p')
    """
    language = language_version(version)
    return Analysis(to_utf8(source), language, exact=exact)


class Line(_host.AnalyzedLine):
    """One logical line: a statement, a statement's head, or a line of comment or nothing.

    `records` is what the line says of names, in the order in which it was found; parameters come last. `logical`
    is the core's own record, with the raw (name, info) pairs in `fTypeEquivs` and `fArgTypeEquivs`. Both are made
    when they are first asked for. `first_line` and `last_line` count physical lines from 1, both inclusive;
    `indent` is the width of the indentation, tabs to multiples of 8. `in_async_def` and `first_in_def` are what
    the line was analysed with: whether it stands directly in the body of an `async def`, and whether it
    is the first of a function's body. `error` is the line's SyntaxError or None; its `msg` names
    what is missing where that is certain, its `lineno` counts from the line's own first line, see
    `error_position`.
    """

    __slots__ = ()

    @property
    def error_position(self) -> tuple[int, int] | None:
        """Where the error lies in the source: (line, column), both from 1, the column in UTF-8 bytes."""
        if self.error is None:
            return None
        return self.first_line + (self.error.lineno or 1) - 1, max(self.error.offset or 1, 1)

    def __repr__(self) -> str:
        return f"<Line {self.first_line}: {self.logical.fType}>"


class _Lines(Sequence[Line]):
    """Lines that are made when they are asked for, and then kept."""

    # How many a loop over all of them makes at a time.
    _CHUNK = 64

    def __init__(self, native: _host.AnalyzedSource) -> None:
        self._native = native
        self._made: list[Line | None] = [None] * len(native)

    def __len__(self) -> int:
        return len(self._made)

    @overload
    def __getitem__(self, index: int) -> Line: ...

    @overload
    def __getitem__(self, index: slice) -> Sequence[Line]: ...

    def __getitem__(self, index: int | slice) -> Line | Sequence[Line]:
        if isinstance(index, slice):
            return [self[place] for place in range(len(self))[index]]
        line = self._made[index]
        if line is None:
            index %= len(self)
            [line] = self._native.MakeLines(self._made, index, index + 1, Line)
        return line

    def __iter__(self) -> Iterator[Line]:
        for start in range(0, len(self), self._CHUNK):
            yield from self._native.MakeLines(self._made, start, start + self._CHUNK, Line)


class Analysis:
    """What `analyze` found in one source. `version` is the (major, minor) that it was read as."""

    def __init__(self, source: bytes, version: tuple[int, int], *, exact: bool = False) -> None:
        self.version = version
        self._source = source
        self._native = _host.AnalyzedSource(native_language_of(version, exact=exact), source, Record, KINDS)

    @property
    def analyzer(self) -> CPGenAnalyzerImpl:
        """The calling thread's analyzer for sources such as this one."""
        return analyzer_for(self.version, print_function=self._native.print_function)

    @property
    def source(self) -> bytes:
        """The source as UTF-8, which is what positions count in."""
        return self._source

    @cached_property
    def lines(self) -> Sequence[Line]:
        """The logical lines, in order; together they cover the source."""
        return _Lines(self._native)

    @property
    def errors(self) -> list[Line]:
        """The lines that have an error, in order."""
        return [self.lines[index] for index in self._native.rows_with_error]

    def source_line(self, number: int) -> bytes:
        """A physical line, counted from 1, as UTF-8 without its end; empty past the last one."""
        return self._physical[number - 1] if 0 < number <= len(self._physical) else b""

    @cached_property
    def _physical(self) -> list[bytes]:
        return _LINE_END.split(self._source.removeprefix(_BOM))
