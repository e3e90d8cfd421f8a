"""What analyzers are made of, by version of Python: grammar files and keywords.

Little is loaded here, since a question that one types has to be answered before one notices.
"""

from __future__ import annotations

import os
import sys

from quillet._keywords import keywords_of
from quillet.config import GetNorvaFilename
from quillet.tarvex import _host, kPy2DefaultGrammar, kPy3DefaultGrammar

# The grammar of 2.7 for a source that imports the print function.
PY2_PRINT_FUNCTION_GRAMMAR = kPy2DefaultGrammar + "-print-function"


def language_version(version: tuple[int, ...] | None = None) -> tuple[int, int]:
    """The (major, minor) of a version tuple, and the running interpreter's for None.

    Raises `TypeError` for anything but a tuple of two or three integers, `ValueError` for a version
    that is neither 2.7 nor 3.x.
    """
    if version is None:
        return sys.version_info[:2]
    if not isinstance(version, tuple) or not 2 <= len(version) <= 3 or not all(isinstance(n, int) for n in version):
        raise TypeError(f"version must be a tuple such as (3, 12), not {version!r}")
    major, minor = version[:2]
    if (major, minor) != (2, 7) and not (major == 3 and 0 <= minor < 256):
        raise ValueError(f"version must be (2, 7) or (3, x), not {version!r}")
    return major, minor


def native_language_of(version: tuple[int, ...] | None = None, *, exact: bool = False) -> _host.Language:
    """What native analyzers of a version are built from; None is the running interpreter's.

    Those of an `exact` one read as `quillet.tarvex` does; the others read what the version has, completely.
    """
    key = (language_version(version), bool(exact))
    if key not in _languages:
        _languages[key] = _make_language(*key)
    return _languages[key]


_languages: dict[tuple[tuple[int, int], bool], _host.Language] = {}


def _make_language(language: tuple[int, int], exact: bool) -> _host.Language:
    python_3 = language >= (3, 0)
    grammar = kPy3DefaultGrammar if python_3 else kPy2DefaultGrammar
    return _host.Language(
        (*language, 0),
        grammar_file=_grammar_path(grammar),
        hint_grammar_file=_grammar_path(kPy3DefaultGrammar),
        keyword_seq=list(keywords_of(language)),
        py3_grammar=python_3,
        print_function_grammar_file="" if python_3 else _grammar_path(PY2_PRINT_FUNCTION_GRAMMAR),
        exact=exact,
    )


def decode_source(source: bytes) -> tuple[bytes | None, str | None]:
    """The UTF-8 of a source that names its encoding, or why there is none."""
    from quillet._source import SourceEncodingError, to_utf8

    try:
        return to_utf8(source), None
    except SourceEncodingError as error:
        return None, str(error)


def available_cores() -> int:
    """The cores that this process may use, which may be fewer than the machine has."""
    if hasattr(os, "sched_getaffinity"):
        return len(os.sched_getaffinity(0))
    return os.cpu_count() or 1


def _grammar_path(grammar_file: str) -> str:
    return GetNorvaFilename("resources/pgen-grammars/" + grammar_file)
