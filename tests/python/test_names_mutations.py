"""Broken statements keep their names: each name token of one is an occurrence in its place, at one thread and at many.

The statements are those of test_mutations.py, broken in the same ways, and stand in a function of a class, whose
scopes they must not take apart. Seeded; QUILLET_FULL=1 makes ten times as many.
"""

from __future__ import annotations

import os
import random
from collections.abc import Iterator

import pytest

from quillet import FileBindings, analyze, analyze_files, bind
from quillet._keywords import keywords_of
from test_mutations import FORMS, PYTHON_2_FORMS, mutated, statements, version_for

FULL = os.environ.get("QUILLET_FULL") == "1"
MUTATED = 100_000 if FULL else 10_000

# Words that are names in some places and none in others.
SOFT = {"match", "case", "type", "_", "print", "exec", "async", "await"}

__all__ = ["statements"]  # a fixture


def described(bindings: FileBindings) -> tuple[list[object], list[object]]:
    """Everything that bindings say, in a form that can be compared."""
    occurrences: list[object] = []
    for occurrence in bindings.occurrences:
        symbol = occurrence.symbol
        variable = None if symbol is None else (symbol.name, symbol.scope, symbol.occurrences)
        occurrences.append((*occurrence[:-1], variable))
    return occurrences, [(*scope[:5], [symbol.name for symbol in scope.symbols]) for scope in bindings.scopes]


def check_indices(bindings: FileBindings, text: str) -> None:
    """Whatever was bound, its numbers lead to what they promise."""
    scopes, occurrences = bindings.scopes, list(bindings.occurrences)
    places = [(occurrence.line, occurrence.column) for occurrence in occurrences]
    assert places == sorted(set(places)), text
    assert (scopes[0].kind, scopes[0].parent) == ("module", None)
    for index, scope in enumerate(scopes[1:], 1):
        assert scope.parent in range(index), text
        assert scope.first_line <= scope.last_line, text
    for index, occurrence in enumerate(occurrences):
        assert occurrence.scope < len(scopes), text
        assert occurrence.receiver is None or (occurrence.receiver < index and occurrence.is_attribute), text
        if occurrence.symbol is not None:
            assert index in occurrence.symbol.occurrences, text


def name_tokens(source: str, version: tuple[int, int]) -> Iterator[tuple[int, int, str]]:
    """The places and spellings of the tokens of rejected statements that are names in any place."""
    words = {*keywords_of(version), *SOFT}
    for line in analyze(source, version=version).errors:
        for token, (row, column) in zip(line.logical.fToks, line.logical.fPositions, strict=True):
            if token is not None and token.isidentifier() and token not in words:
                yield line.first_line + row, column + 1, token


def test_name_tokens_of_broken_statements_are_occurrences(
    statements: list[str], capsys: pytest.CaptureFixture[str]
) -> None:
    draw = random.Random(11)
    names = 0
    for _ in range(MUTATED):
        text = mutated(draw, draw.choice(statements))
        version = version_for(draw)
        # What the broken statement leaves open (a bracket, a string, a backslash) may take the next line with it.
        inner = text.replace("\n", "\n        ")
        source = f"class Outer:\n    def method(self):\n        {inner}\n\n\ndef behind(): pass\nbehind.last = self\n"
        bindings = bind(source, version=version)
        check_indices(bindings, text)
        found = {(o.line, o.column): o.text for o in bindings.occurrences}
        for line, column, token in name_tokens(source, version):
            names += 1
            assert found.get((line, column)) == token, (version, text, line, column, token)
        *_, behind, last, own = bindings.occurrences
        assert (behind.text, last.text, own.text) == ("behind", "last", "self"), text
        assert (behind.scope, last.is_attribute, last.role, own.role) == (0, True, "write", "read"), text
    with capsys.disabled():
        print(f"\n{MUTATED:,} broken statements: {names:,} names of those that are rejected, all there")
    assert names > MUTATED


def test_threads_bind_alike(statements: list[str]) -> None:
    draw = random.Random(12)
    files = []
    for number in range(200):
        texts = [mutated(draw, draw.choice(statements)) for _ in range(40)]
        files.append((f"{number}.py", "\n".join(texts).encode("utf-8", "surrogatepass")))
    for version in ((2, 7), (3, 13)):
        alone = [described(bind(source, version=version)) for _, source in files]
        for jobs in (1, 4):
            with analyze_files(files, version=version, jobs=jobs, bindings=True) as results:
                assert [described(result.bindings) for result in results] == alone


def test_truncated_statements_keep_the_names_in_front() -> None:
    """A statement cut behind any token has the same names up to the cut, each in the same place."""
    for text in FORMS + PYTHON_2_FORMS:
        version = (2, 7) if text in PYTHON_2_FORMS else (3, 13)
        whole = {(o.line, o.column): o.text for o in bind(text, version=version).occurrences}
        for end in range(len(text)):
            found = {(o.line, o.column): o.text for o in bind(text[:end], version=version).occurrences}
            for line, column, token in name_tokens(text[:end], version):
                assert found.get((line, column)) == token, text[:end]
        assert whole or text == "case _:" or text == "case -1 - 2j:", text
