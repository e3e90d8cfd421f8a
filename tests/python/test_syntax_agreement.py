"""A syntax error here is one there: a sample of what `syntax_agreement.py` compares, with the running interpreter.

QUILLET_FULL=1 takes every interpreter that is found, all of its library and 200,000 broken statements.
"""

from __future__ import annotations

import ast
import os
import re
import sys
import warnings

import pytest

from quillet import analyze
from survey import Library, libraries
from syntax_agreement import SyntaxReport, compare, library_sources, mutated_sources

FULL = os.environ.get("QUILLET_FULL") == "1"
EACH_NTH_FILE = 1 if FULL else 24
MUTATED = 200_000 if FULL else 2_000
FOUND = libraries()
NEWEST = max(FOUND)
CHOSEN = list(FOUND.values()) if FULL else [FOUND[NEWEST]]


@pytest.mark.parametrize("library", CHOSEN, ids=lambda library: library.name)
def test_the_library_is_taken_as_its_interpreter_takes_it(library: Library) -> None:
    report = compare(library, library_sources(library, EACH_NTH_FILE))
    assert report.sources > 20
    # A file that names an encoding that nobody knows is for whoever decodes it.
    overlooked = {why: report.examples[why] for why in report.overlooked if "encoding" not in why}
    assert (overlooked, report.invented) == ({}, {})


@pytest.mark.parametrize("library", CHOSEN, ids=lambda library: library.name)
def test_broken_statements_are_rejected_alike(library: Library) -> None:
    report = compare(library, mutated_sources(library, MUTATED, EACH_NTH_FILE))
    assert report.errors > MUTATED / 2
    assert report.agreeing / report.sources > 0.999, {**report.overlooked, **report.invented}
    if library.version >= (3, 10):
        assert report.places / report.errors > 0.9
        assert report.words / report.errors > 0.8


@pytest.mark.parametrize(
    ("answer", "source", "counted"),
    [
        (None, "x = = 1\n", "invented"),
        (["SyntaxError", "invalid syntax", 1, 1], "x = 1\n", "overlooked"),
        (["SyntaxError", "invalid syntax", 1, 2], "x = = 1\n", "other_places"),
        (["SyntaxError", "another", 1, 5], "x = = 1\n", "other_places"),
    ],
)
def test_a_difference_is_seen(answer: list[object] | None, source: str, counted: str) -> None:
    report = SyntaxReport()
    report.compare(source, answer, analyze(source))
    assert getattr(report, counted).total() == 1


#: What is wrong with the place of a statement among others, with its names or its version: it is understood.
OF_THE_PLACE = re.compile(
    r"expected an indented|expected 'except' or|unexpected (un)?indent|unindent does not|inconsistent use|"
    r"default 'except:'|cannot have both 'except'|remaining patterns unreachable|outside loop|not properly in loop|"
    r"from __future__|future feature|too many (levels|statically)|only supported in Python"
)


#: What the grammar takes and the compiler does not.
PLACED_WRONG = [
    "return a.b\n",
    "class C:\n return a\n",
    "f(x=a, x=b)\n",
    "def f(a, b, a): pass\n",
    "a = await b\n",
    "a = yield b\n",
    "for a in b: pass\nelse: continue\nwhile c: d\nif e: break\n",
    "try: a\nexcept: b\nexcept C: d\n",
    "a = 1\nfrom __future__ import d\n",
    "def f():\n a\n global a\n",
    "def f():\n nonlocal a\n",
    "def f():\n from a import *\n",
]


def is_understood(source: str) -> bool:
    """Whether the parser of the running interpreter takes it, whatever its compiler says."""
    with warnings.catch_warnings():
        warnings.simplefilter("ignore")
        try:
            ast.parse(source)
        except SyntaxError:
            return False
    return True


def test_a_statement_keeps_its_records_if_the_parser_understands_it() -> None:
    """What the grammar rejects has none; what only the compiler rejects, or what stands around it, has all."""
    library = FOUND.get(sys.version_info[:2])
    if library is None:
        pytest.skip("the running interpreter has no library of its own here")
    kept = dropped = 0
    for source in PLACED_WRONG + mutated_sources(library, MUTATED, EACH_NTH_FILE):
        analysis = analyze(source, version=library.version)
        errors = analysis.errors
        if not errors:
            continue
        if is_understood(source):
            # An exact reading asks the grammar alone.
            exact = analyze(source, version=library.version, exact=True).lines
            for line, other in zip(analysis.lines, exact, strict=True):
                if line.error is not None and other.error is None:
                    assert bool(line.records) == bool(other.records), source
                    kept += bool(line.records)
        elif len(errors) == 1 and errors[0].error is not None and not OF_THE_PLACE.search(errors[0].error.msg):
            row, column = errors[0].error_position or (0, 0)
            # A clause without its statement is named at its first word.
            begin = re.match(r"\s*", source.split("\n")[row - 1])
            if begin is not None and begin.end() + 1 == column:
                continue
            assert errors[0].records == (), source
            dropped += 1
    assert kept >= len(PLACED_WRONG)
    assert dropped > MUTATED / 2
