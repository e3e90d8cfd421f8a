"""Every occurrence of every name of a source, the scopes, and the symbols that they hold.

The core binds names from the tokens of the statements, those that no grammar takes included, and holds
plain numbers; objects are made when they are asked for.
"""

from __future__ import annotations

from collections.abc import Iterator, Sequence
from typing import Final, NamedTuple, cast, overload

from quillet._source import to_utf8
from quillet.host import language_version
from quillet.tarvex import _host

_KINDS: Final = (None, *_host.NAME_KIND_WORDS)
_WORDS = _host.NAME_FLAG_WORDS
# A set for each number that bits of flags can make.
_FLAGS: Final = tuple(
    frozenset(word for bit, word in enumerate(_WORDS) if number >> bit & 1) for number in range(1 << len(_WORDS))
)
_BIT: Final = {question: 1 << bit for bit, question in enumerate(_host.SYMBOL_QUESTIONS)}
_IS_PARAMETER: Final = _BIT["is_parameter"]
_IS_GLOBAL: Final = _BIT["is_global"]
_IS_DECLARED_GLOBAL: Final = _BIT["is_declared_global"]
_IS_NONLOCAL: Final = _BIT["is_nonlocal"]
_IS_LOCAL: Final = _BIT["is_local"]
_IS_FREE: Final = _BIT["is_free"]
_IS_IMPORTED: Final = _BIT["is_imported"]
_IS_ASSIGNED: Final = _BIT["is_assigned"]
_IS_REFERENCED: Final = _BIT["is_referenced"]
_IS_ANNOTATED: Final = _BIT["is_annotated"]
_IS_NAMESPACE: Final = _BIT["is_namespace"]
# How many occurrences become objects at a time where all are iterated over.
_CHUNK = 4096


class Symbol:
    """A name in a scope.

    `name` is normalised (NFKC) and, for a private name in a class, mangled, as the language has it. `scope` is the
    index of the scope. The questions are those of the standard library's `symtable.Symbol`, and have the answers
    that the version of Python that the source is written for gives.

    Each scope has a symbol for every name that it mentions; `variable` is the symbol of the scope that owns the
    name, which is this one where the scope owns it. A symbol is `is_listed` where the language's own symbol
    tables have it: not so one that only comments and strings mention, and one that stands for a global
    name that no statement of the module binds.
    """

    __slots__ = ("_answers", "_index", "_native", "_owner", "is_listed", "name", "scope")

    name: str
    scope: int
    is_listed: bool

    def __init__(self, native: _host.FileNames, index: int, row: tuple[str, int, int, bool, int]) -> None:
        self._native = native
        self._index = index
        self._owner: Symbol | None = None  # where that is another one
        self.name, self.scope, self._answers, self.is_listed, _ = row

    @property
    def variable(self) -> Symbol:
        """The symbol that owns the variable."""
        return self._owner or self

    @property
    def occurrences(self) -> tuple[int, ...]:
        """The indices of its occurrences: of a variable's owner all of them, in whatever scope; otherwise those
        in this scope.
        """
        return self._native.OccurrencesOf(self._index)

    def is_parameter(self) -> bool:
        """Whether it is a parameter."""
        return self._answers & _IS_PARAMETER != 0

    def is_global(self) -> bool:
        """Whether it is a name of the module."""
        return self._answers & _IS_GLOBAL != 0

    def is_declared_global(self) -> bool:
        """Whether a `global` statement names it."""
        return self._answers & _IS_DECLARED_GLOBAL != 0

    def is_nonlocal(self) -> bool:
        """Whether a `nonlocal` statement names it."""
        return self._answers & _IS_NONLOCAL != 0

    def is_local(self) -> bool:
        """Whether its scope owns it."""
        return self._answers & _IS_LOCAL != 0

    def is_free(self) -> bool:
        """Whether a function around owns it."""
        return self._answers & _IS_FREE != 0

    def is_imported(self) -> bool:
        """Whether an import binds it."""
        return self._answers & _IS_IMPORTED != 0

    def is_assigned(self) -> bool:
        """Whether something else than an import or a parameter binds it."""
        return self._answers & _IS_ASSIGNED != 0

    def is_referenced(self) -> bool:
        """Whether it is read in its scope."""
        return self._answers & _IS_REFERENCED != 0

    def is_annotated(self) -> bool:
        """Whether it has an annotation."""
        return self._answers & _IS_ANNOTATED != 0

    def is_namespace(self) -> bool:
        """Whether a class or a function has this name."""
        return self._answers & _IS_NAMESPACE != 0

    def __repr__(self) -> str:
        questions = [question[3:] for question, bit in _BIT.items() if self._answers & bit]
        return f"<Symbol {self.name!r}: {', '.join(questions)}>"


class Occurrence(NamedTuple):
    """A name in its place.

    `text` is how it is spelled. `line` and `column` are from 1, columns in UTF-8 bytes, the end exclusive. `role` is
    "definition", "write", "read", "call", "delete", "import", "keyword" or "declaration". `kind` says what the name
    becomes where it is bound: "class", "function", "parameter", "variable", "type_parameter", "type_alias" or
    "import"; otherwise it is None. `flags` say where it stands: "decorator", "base", "annotation",
    "augmented", "comment", "string". `receiver` is the index of the occurrence that an attribute is taken from,
    and None where that is no name. `scope` is the index of the scope in which it stands, `symbol` the variable
    that it belongs to: None for attributes and keyword names.
    """

    text: str
    line: int
    column: int
    end_column: int
    role: str
    kind: str | None
    flags: frozenset[str]
    receiver: int | None
    is_attribute: bool
    scope: int
    symbol: Symbol | None


class Scope(NamedTuple):
    """A piece of the source with names of its own.

    `kind` is "module", "class", "function", "lambda", "comprehension", "type parameters" or "annotation"; `name` is
    that of what opens it, and empty where that has none. `parent` is the index of the scope around, None for the
    module. `symbols` are the names that it mentions, in the order of their first mention. Lines and columns are
    those of its first byte (of a definition the word `class`, `def` or `async`) and behind the last byte of its last
    statement. `has_star_import` is true where `from m import *` may bind any name. A scope is not
    `is_listed` where the language's own symbol tables lack it: in comments, strings and annotations that are
    never evaluated.
    """

    kind: str
    name: str
    parent: int | None
    first_line: int
    last_line: int
    symbols: tuple[Symbol, ...]
    column: int
    end_column: int
    has_star_import: bool
    is_listed: bool


class FileOccurrences(Sequence[Occurrence]):
    """The occurrences of a source, in its order. Made when they are asked for."""

    def __init__(self, bindings: FileBindings) -> None:
        self._bindings = bindings

    def __len__(self) -> int:
        return self._bindings._native.occurrence_count

    @overload
    def __getitem__(self, index: int) -> Occurrence: ...

    @overload
    def __getitem__(self, index: slice) -> Sequence[Occurrence]: ...

    def __getitem__(self, index: int | slice) -> Occurrence | Sequence[Occurrence]:
        places = range(len(self))[index]
        if isinstance(places, int):
            [occurrence] = self._rows(places, places + 1)
            return occurrence
        if places.step == 1:
            return self._rows(places.start, places.stop)
        return [self[place] for place in places]

    def __iter__(self) -> Iterator[Occurrence]:
        for start in range(0, len(self), _CHUNK):
            yield from self._rows(start, start + _CHUNK)

    def _rows(self, begin: int, end: int) -> list[Occurrence]:
        native = self._bindings._native
        roles = _host.NAME_ROLE_WORDS
        rows = native.Occurrences(begin, end, Occurrence, roles, _KINDS, _FLAGS, self._bindings._symbols)
        return cast("list[Occurrence]", rows)

    def __repr__(self) -> str:
        return f"<FileOccurrences: {len(self)}>"


class FileBindings:
    """The names of a source: its occurrences, and the scopes with their symbols."""

    __slots__ = ("_all_scopes", "_all_symbols", "_native")

    def __init__(self, native: _host.FileNames) -> None:
        self._native = native
        self._all_symbols: list[Symbol] | None = None
        self._all_scopes: tuple[Scope, ...] | None = None

    @property
    def occurrences(self) -> FileOccurrences:
        """All occurrences, in the order of the source."""
        return FileOccurrences(self)

    @property
    def scopes(self) -> Sequence[Scope]:
        """All scopes, the module first, each behind the one around it."""
        if self._all_scopes is None:
            self._all_scopes = tuple(self._native.Scopes(Scope, _host.NAME_SCOPE_KIND_WORDS, self._symbols))
        return self._all_scopes

    @property
    def byte_count(self) -> int:
        """The bytes that are held of them, before any of it becomes an object."""
        return self._native.byte_count

    @property
    def _symbols(self) -> list[Symbol]:
        if self._all_symbols is None:
            rows = self._native.Symbols()
            symbols = [Symbol(self._native, index, row) for index, row in enumerate(rows)]
            for index, row in enumerate(rows):
                if row[-1] != index:
                    symbols[index]._owner = symbols[row[-1]]
            self._all_symbols = symbols
        return self._all_symbols

    def __repr__(self) -> str:
        return f"<FileBindings: {len(self.occurrences)} occurrences>"


def bind(source: str | bytes, *, version: tuple[int, ...] | None = None) -> FileBindings:
    """Binds the names of a source: where each stands, what it does there, and which variable it is.

    `version` is the Python that the source is written for, the running one's without it. Statements that are no
    Python give their names as well. Raises as `analyze` does for wrong arguments.

    >>> for name in bind("def add(a, b):\\n    return a + b\\n").occurrences:
    ...     print((name.line, name.column, name.text, name.role, name.kind))
    (1, 5, 'add', 'definition', 'function')
    (1, 9, 'a', 'definition', 'parameter')
    (1, 12, 'b', 'definition', 'parameter')
    (2, 12, 'a', 'read', None)
    (2, 16, 'b', 'read', None)
    """
    return FileBindings(_host.bind_names((*language_version(version), 0), to_utf8(source)))
