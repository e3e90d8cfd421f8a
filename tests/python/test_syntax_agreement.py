"""A syntax error here is one there: a sample of what `syntax_agreement.py` compares, with the running interpreter.

QUILLET_FULL=1 takes every interpreter that is found, all of its library and 200,000 broken statements.
"""

from __future__ import annotations

import os

import pytest

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
    from quillet import analyze

    report = SyntaxReport()
    report.compare(source, answer, analyze(source))
    assert getattr(report, counted).total() == 1
