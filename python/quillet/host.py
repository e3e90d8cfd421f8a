"""A whole source at once: bytes or text in, its statements and what each says of names out.

The source becomes UTF-8 (`_source`), is cut into logical lines by the core, and each line is analysed
where it stands. Nothing becomes a Python object of its own before it is read: a `Line` is made when
`Analysis.lines` is asked for it, its records are decoded when `Line.records` is. An analyzer is
expensive to build and serves one thread, so each thread keeps one a version.
"""

from __future__ import annotations

import re
import threading
from collections.abc import Iterator, Sequence
from functools import cached_property
from typing import overload

from quillet._keywords import keywords_of
from quillet._languages import PY2_PRINT_FUNCTION_GRAMMAR
from quillet._languages import language_version as language_version
from quillet._records import Record, decode_record
from quillet._source import to_utf8
from quillet.logicalline import CLogicalLine
from quillet.tarvex import CPGenAnalyzerImpl, _host, kPy2DefaultGrammar, kPy3DefaultGrammar

_LINE_END = re.compile(rb"\r\n|\r|\n")
_BOM = b"\xef\xbb\xbf"

# A line as the core cuts it: the record, its first and last physical line (from 0), the width of its
# indentation, whether it stands in an `async def`, and whether it is the first of a function's body.
_Row = tuple[CLogicalLine, int, int, int, bool, bool]


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


def analyze(source: bytes | bytearray | memoryview | str, *, version: tuple[int, ...] | None = None) -> Analysis:
    """Analyses a source, statement by statement.

    `source` is the content of a file: bytes, read as their byte order mark or their PEP 263 line says and
    as UTF-8 without either, or text. `version` is the Python that it is written for, such as (2, 7) or
    (3, 12); None is the running interpreter's. Both grammars are served by any interpreter.

    Any content is analysed to its end: a bad statement has an `error` and no records, and the others are
    served. Raises `SourceEncodingError` where the source names an encoding that cannot be used,
    `TypeError` and `ValueError` for wrong arguments.

    >>> for record in analyze("import os.path as p").lines[0].records:
    ...     print((record.name, record.kind.value, record.detail))
    ('p', 'set', '')
    ('p', 'import', 'os.path')
    ('p', 'import_as', 'p')
    """
    language = language_version(version)
    return Analysis(to_utf8(source), language)


class Line:
    """One logical line: a statement, a statement's head, or a line of comment or nothing.

    `logical` is the core's own record, with the raw (name, info) pairs in `fTypeEquivs` and
    `fArgTypeEquivs`. `first_line` and `last_line` count physical lines from 1, both inclusive; `indent`
    is the width of the indentation, tabs to multiples of 8. `in_async_def` and `first_in_def` are what
    the line was analysed with: whether it stands directly in the body of an `async def`, and whether it
    is the first of a function's body. `error` is the line's SyntaxError or None; its `lineno` counts
    from the line's own first line, see `error_position`.
    """

    __slots__ = ("_records", "error", "first_in_def", "first_line", "in_async_def", "indent", "last_line", "logical")

    def __init__(self, row: _Row, error: SyntaxError | None) -> None:
        self.logical: CLogicalLine = row[0]
        self.first_line: int = row[1] + 1
        self.last_line: int = row[2] + 1
        self.indent: int = row[3]
        self.in_async_def: bool = row[4]
        self.first_in_def: bool = row[5]
        self.error = error
        self._records: tuple[Record, ...] | None = None

    @property
    def records(self) -> tuple[Record, ...]:
        """What the line says of names, in the order in which it was found; parameters come last."""
        if self._records is None:
            found = [decode_record(name, info, False) for name, info in self.logical.fTypeEquivs or ()]
            found += [decode_record(name, info, True) for name, info in self.logical.fArgTypeEquivs or ()]
            self._records = tuple(found)
        return self._records

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

    def __init__(self, rows: list[_Row], errors: dict[int, SyntaxError]) -> None:
        self._rows = rows
        self._errors = errors
        self._made: dict[int, Line] = {}

    def __len__(self) -> int:
        return len(self._rows)

    @overload
    def __getitem__(self, index: int) -> Line: ...

    @overload
    def __getitem__(self, index: slice) -> Sequence[Line]: ...

    def __getitem__(self, index: int | slice) -> Line | Sequence[Line]:
        places = range(len(self._rows))[index]
        if isinstance(places, int):
            return self._at(places)
        return [self._at(place) for place in places]

    def __iter__(self) -> Iterator[Line]:
        return map(self._at, range(len(self._rows)))

    def _at(self, index: int) -> Line:
        line = self._made.get(index)
        if line is None:
            line = self._made[index] = Line(self._rows[index], self._errors.get(index))
        return line


class Analysis:
    """What `analyze` found in one source. `version` is the (major, minor) that it was read as."""

    def __init__(self, source: bytes, version: tuple[int, int]) -> None:
        self.version = version
        self._source = source
        cut = _host.CutSource(source, (*version, 0))
        self._rows: list[_Row] = list(cut)
        self._errors: dict[int, SyntaxError] = {}
        self._print_function: bool = cut.print_function
        analyze_line = self.analyzer.AnalyzeSingleLogical
        for index, (logical, _, _, _, in_async_def, first_in_def) in enumerate(self._rows):
            error = analyze_line(logical, in_async_def, first_in_def)
            if error is not None:
                self._errors[index] = error

    @property
    def analyzer(self) -> CPGenAnalyzerImpl:
        """The calling thread's analyzer for sources such as this one."""
        return analyzer_for(self.version, print_function=self._print_function)

    @property
    def source(self) -> bytes:
        """The source as UTF-8, which is what positions count in."""
        return self._source

    @cached_property
    def lines(self) -> Sequence[Line]:
        """The logical lines, in order; together they cover the source."""
        return _Lines(self._rows, self._errors)

    @property
    def errors(self) -> list[Line]:
        """The lines that have an error, in order."""
        return [self.lines[index] for index in self._errors]

    def source_line(self, number: int) -> bytes:
        """A physical line, counted from 1, as UTF-8 without its end; empty past the last one."""
        return self._physical[number - 1] if 0 < number <= len(self._physical) else b""

    @cached_property
    def _physical(self) -> list[bytes]:
        return _LINE_END.split(self._source.removeprefix(_BOM))
