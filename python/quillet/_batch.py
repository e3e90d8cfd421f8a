"""The native path for a version: sources in memory to records in their arenas, no object a line."""

from __future__ import annotations

from quillet._keywords import keywords_of
from quillet.config import GetNorvaFilename
from quillet.host import PY2_PRINT_FUNCTION_GRAMMAR, language_version
from quillet.tarvex import _host, kPy2DefaultGrammar, kPy3DefaultGrammar


def native_batch(version: tuple[int, ...] | None = None) -> _host.NativeBatch:
    """A native batch with the grammar and the keywords of a version; None is the running interpreter's."""
    language = language_version(version)
    python_3 = language >= (3, 0)
    grammar = kPy3DefaultGrammar if python_3 else kPy2DefaultGrammar
    return _host.NativeBatch(
        (*language, 0),
        grammar_file=_grammar_path(grammar),
        hint_grammar_file=_grammar_path(kPy3DefaultGrammar),
        keyword_seq=list(keywords_of(language)),
        py3_grammar=python_3,
        print_function_grammar_file="" if python_3 else _grammar_path(PY2_PRINT_FUNCTION_GRAMMAR),
    )


def _grammar_path(grammar_file: str) -> str:
    return GetNorvaFilename("resources/pgen-grammars/" + grammar_file)
