"""The host API: encodings, versions, lines and their place, decoded records, errors."""

from __future__ import annotations

import copy
import gc
import sys
import threading
import weakref
from collections.abc import Callable
from pathlib import Path

import pytest
from hypothesis import given
from hypothesis import strategies as st

import quillet
from quillet import RecordKind, SourceEncodingError, analyze
from quillet.config import GetNorvaFilename
from quillet.logicalline import GetLogicalsFromText
from quillet.optpgen import ParserGenerator
from quillet.tarvex import _host


def records_of(source: str | bytes, version: tuple[int, ...] | None = None) -> list[tuple[str, str, str, bool]]:
    return [
        (record.name, record.kind.value, record.detail, record.is_parameter)
        for line in analyze(source, version=version).lines
        for record in line.records
    ]


def names_set(source: str | bytes, version: tuple[int, ...] | None = None) -> list[str]:
    return [name for name, kind, _, is_parameter in records_of(source, version) if kind == "set" and not is_parameter]


# ---- what a source may be ----


def test_text_and_its_utf8_bytes_are_analysed_alike() -> None:
    text = "größe = 'π'\nvalue = größe\n"
    assert records_of(text) == records_of(text.encode()) != []


@pytest.mark.parametrize("kind", [bytearray, memoryview])
def test_other_bytes_are_taken(kind: type) -> None:
    assert names_set(kind(b"x = 1\n")) == ["x"]


def test_a_byte_order_mark_counts_in_no_column() -> None:
    error = analyze(b"\xef\xbb\xbfx = = 1\n").lines[0]
    assert error.error_position == (1, 5)


def test_the_encoding_line_says_how_bytes_are_read() -> None:
    source = "# -*- coding: latin-1 -*-\nné = 1\n".encode("latin-1")
    analysis = analyze(source)
    assert [record.name for record in analysis.lines[1].records] == ["né", "né"]
    assert analysis.source_line(2) == "né = 1".encode()


def test_columns_of_a_decoded_source_count_its_utf8_bytes() -> None:
    assert analyze("# coding: latin-1\né = = 1\n".encode("latin-1")).lines[1].error_position == (2, 6)


@pytest.mark.parametrize(
    "first_lines",
    [b"#!/bin/python\n# vim: set fileencoding=cp1252 :\n", b"\n# coding=cp1252\n", b"# coding: cp1252-unix\n"],
)
def test_the_encoding_is_found_where_python_finds_it(first_lines: bytes) -> None:
    assert names_set(first_lines + b"\x8a = 1\n") == ["Š"]


def test_an_encoding_line_behind_code_does_not_count() -> None:
    assert analyze(b"x = 1\n# coding: no-such\n").errors == []


def test_an_encoding_line_in_text_does_not_count() -> None:
    assert names_set("# coding: no-such\nx = 1\n") == ["x"]


@pytest.mark.parametrize("name", ["no-such-encoding", "hex", "rot13", "undefined", "idna"])
def test_an_encoding_that_cannot_be_used_is_named(name: str) -> None:
    with pytest.raises(SourceEncodingError, match=name):
        analyze(f"# coding: {name}\nx = 1\n".encode())


def test_bytes_that_the_named_encoding_lacks_spoil_their_statement_alone() -> None:
    analysis = analyze(b"# coding: ascii\nx = \xff\ny = 1\n")
    assert [line.first_line for line in analysis.errors] == [2]
    assert [record.name for record in analysis.lines[2].records][:1] == ["y"]


def test_invalid_utf8_spoils_its_statement_alone() -> None:
    analysis = analyze(b"a = 1\nb = \xff\xfe\nc = 1\n")
    assert [line.first_line for line in analysis.errors] == [2]
    assert names_set(b"a = 1\nb = \xff\xfe\nc = 1\n") == ["a", "c"]


def test_a_lone_surrogate_in_text_spoils_its_statement_alone() -> None:
    assert names_set("a = 1\nb = \ud800\nc = 1\n") == ["a", "c"]


@pytest.mark.parametrize("source", [None, 1, ["x = 1"], object()])
def test_what_is_no_source_is_a_type_error(source: object) -> None:
    with pytest.raises(TypeError, match="source must be bytes or str"):
        analyze(source)  # type: ignore[arg-type]


def test_an_empty_source_has_no_statement() -> None:
    assert records_of(b"") == []


@given(st.binary(max_size=200))
def test_any_bytes_are_analysed_to_their_end(source: bytes) -> None:
    for exact in (False, True):
        try:
            analysis = analyze(source, exact=exact)
        except SourceEncodingError:
            return
        for line in analysis.lines:
            assert 1 <= line.first_line <= line.last_line
            # What is wrong in its context alone has records, too.
            assert line.error is None or not line.records or not exact


# Statements and scraps of them, so that most texts come near to Python.
_SCRAPS = (
    "def f(a, *b):|class C:|x = |(|)|[|]|\n|    |\t|if x:|return|'|\"\"\"|f'{|}'|# type: int|lambda|match x:|"
    "case [a, *_]:|async |await y|;|\\|:|,|@|=|é"
).split("|")


@given(st.lists(st.sampled_from(_SCRAPS), max_size=30), st.sampled_from([(2, 7), (3, 6), (3, 8), (3, 12)]))
def test_lines_are_in_order_and_errors_lie_in_the_source(scraps: list[str], version: tuple[int, int]) -> None:
    source = "".join(scraps)
    analysis = analyze(source, version=version)
    last = 0
    for line in analysis.lines:
        assert line.first_line >= last
        last = line.first_line
        if line.error_position is not None:
            row, column = line.error_position
            assert 1 <= row <= source.count("\n") + 2
            assert column >= 1


# ---- versions ----


def test_none_is_the_running_interpreter() -> None:
    assert analyze("x = 1").version == sys.version_info[:2]


@pytest.mark.parametrize(
    ("source", "accepts", "rejects"),
    [
        ("print 'x'", (2, 7), (3, 8)),
        ("exec code in scope", (2, 7), (3, 8)),
        ("x = `y`", (2, 7), (3, 8)),
        ("raise E, 'text'", (2, 7), (3, 8)),
        ("def f(a, (b, c)): pass", (2, 7), (3, 8)),
        ("def f(x):\n  def g(): nonlocal x", (3, 8), (2, 7)),
        ("x: int = 1", (3, 8), (2, 7)),
        ("def f(*, a): pass", (3, 8), (2, 7)),
        ("async = 1", (3, 6), (3, 7)),
        ("print = None", (3, 8), (2, 7)),
    ],
)
def test_the_version_picks_grammar_and_keywords(
    source: str, accepts: tuple[int, int], rejects: tuple[int, int]
) -> None:
    assert analyze(source, version=accepts).errors == []
    assert len(analyze(source, version=rejects).errors) == 1


def test_async_is_a_name_before_3_7() -> None:
    assert names_set("async = 1", (3, 6)) == ["async"]


def test_a_micro_version_says_nothing_more() -> None:
    assert analyze("x = 1", version=(3, 12, 4)).version == (3, 12)
    assert quillet.analyzer_for((3, 12, 4)) is quillet.analyzer_for((3, 12))


@pytest.mark.parametrize("version", ["3.8", [3, 8], (3,), (3, "8"), 3.8, (3, 8, 0, 0)])
def test_what_is_no_version_is_a_type_error(version: object) -> None:
    with pytest.raises(TypeError, match="version must be a tuple"):
        analyze("x = 1", version=version)  # type: ignore[arg-type]


@pytest.mark.parametrize("version", [(2, 6), (1, 5), (4, 0), (3, -1)])
def test_a_version_without_a_grammar_is_a_value_error(version: tuple[int, int]) -> None:
    with pytest.raises(ValueError, match="version must be"):
        analyze("x = 1", version=version)


def test_each_thread_has_an_analyzer_of_its_own() -> None:
    found = []
    threads = [threading.Thread(target=lambda: found.append(quillet.analyzer_for((3, 8)))) for _ in range(2)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    assert len({id(analyzer) for analyzer in [*found, quillet.analyzer_for((3, 8))]}) == 3


# ---- lines ----

SOURCE = """\
import os

async def fetch(url):
    # type: (str) -> bytes
    if url:
        data = await get(
            url,
        )
        def inner():
            '''doc'''
            return 1
    class Local:
        x = 1
    return data
def short(): return 1; pass
"""


def test_lines_have_their_place_in_the_source() -> None:
    places = [
        (line.first_line, line.last_line, line.indent)
        for line in analyze(SOURCE).lines
        if line.logical.fType != "blank line"
    ]
    assert places == [
        (1, 1, 0),
        (3, 3, 0),
        (4, 4, 4),
        (5, 5, 4),
        (6, 8, 8),
        (9, 9, 8),
        (10, 10, 12),
        (11, 11, 12),
        (12, 12, 4),
        (13, 13, 8),
        (14, 14, 4),
        (15, 15, 0),
        (15, 15, 0),
        (15, 15, 0),
    ]


def test_a_source_can_be_cut_for_hosts_that_analyse_by_themselves() -> None:
    analyzer = quillet.analyzer_for((3, 8))
    cut = _host.CutSource(SOURCE.encode(), (3, 8, 0))
    assert iter(cut) is cut
    lines = analyze(SOURCE, version=(3, 8), exact=True).lines
    found = list(cut)
    assert next(cut, None) is None
    assert [(*place, first) for _, *place, first in found] == [
        (line.first_line - 1, line.last_line - 1, line.indent, line.in_async_def, line.first_in_def) for line in lines
    ]
    del cut
    for (logical, *_, in_async_def, first_in_def), line in zip(found, lines, strict=True):
        assert analyzer.AnalyzeSingleLogical(logical, in_async_def, first_in_def) is None
        assert logical.fTypeEquivs == line.logical.fTypeEquivs
        assert logical.fArgTypeEquivs == line.logical.fArgTypeEquivs


def test_lines_of_a_cut_may_be_let_go_of_one_by_one() -> None:
    analyzer = quillet.analyzer_for((3, 8))
    records = 0
    for logical, *_, in_async_def, first_in_def in _host.CutSource(SOURCE.encode(), (3, 8, 0)):
        analyzer.AnalyzeSingleLogical(logical, in_async_def, first_in_def)
        records += len(logical.fTypeEquivs or ()) + len(logical.fArgTypeEquivs or ())
    assert records == sum(len(line.records) for line in analyze(SOURCE, version=(3, 8), exact=True).lines) > 0


def test_what_a_cut_gives_is_told_apart_by_its_hash() -> None:
    cut = _host.CutSource(b"a\nb\n", (3, 8, 0))
    hashes = [hash(place) for place in cut]
    cut = _host.CutSource(b"a\nb\n", (3, 8, 0))
    kept = list(cut)
    assert hash(kept[0][1:]) != hash(kept[1][1:])
    assert len(set(hashes)) == 2


def test_a_cut_serves_code_that_runs_when_its_lines_go() -> None:
    cut = _host.CutSource(b"a\nb\nc\nd\n", (3, 8, 0))
    taken = []

    class Nosy:
        def __del__(self) -> None:
            taken.append(next(cut))

    next(cut)[0].fTypeEquivs = [Nosy()]
    logical, first_line, *_ = next(cut)
    assert (logical.fToks, first_line) == (("b",), 1)
    [(logical, first_line, *_)] = taken
    assert (logical.fToks, first_line) == (("c",), 2)
    kept = next(cut)
    assert next(cut, None) is None
    assert (kept[0].fToks, kept[1:]) == (("d",), (3, 3, 0, False, False))


def test_what_cannot_be_cut_is_a_type_error() -> None:
    with pytest.raises(TypeError):
        _host.CutSource(SOURCE, (3, 8, 0))  # type: ignore[arg-type]
    with pytest.raises(TypeError):
        _host.CutSource(b"x", 3)  # type: ignore[arg-type]
    with pytest.raises(TypeError):
        next(_host.CutSource.__new__(_host.CutSource))


def test_a_line_knows_the_async_def_that_it_stands_in() -> None:
    inside = [line.first_line for line in analyze(SOURCE).lines if line.in_async_def]
    assert [number for number in inside if number != 2] == [4, 5, 6, 9, 12, 14]


def test_a_line_knows_that_it_is_first_in_a_function() -> None:
    first = [line.first_line for line in analyze(SOURCE).lines if line.first_in_def]
    assert first == [4, 5, 10, 15]  # a comment in front of the first statement counts with it


def test_a_signature_comment_on_its_own_line_is_read() -> None:
    assert ("<argument 0>", "hint", "str", False) in records_of(SOURCE)
    assert ("return", "hint", "bytes", False) in records_of(SOURCE)


def test_lines_are_a_sequence_of_kept_objects() -> None:
    lines = analyze("a = 1\nb = 2\nc = 3\n").lines
    assert len(lines) == 3
    assert lines[0] is lines[0]
    assert lines[-1] is lines[2]
    assert list(lines)[1] is lines[1]
    assert lines[1:] == [lines[1], lines[2]]
    with pytest.raises(IndexError):
        lines[3]


def test_the_raw_records_stay_reachable() -> None:
    line = analyze("x = 1").lines[0]
    records = line.logical.fTypeEquivs
    assert records is not None
    assert records[0][0] == b"x"
    assert all(type(name) is bytes and type(info) is bytes for name, info in records)


# ---- records ----


@pytest.mark.parametrize(
    ("source", "expected"),
    [
        ("x = y", ("x", "equal", "y", False)),
        ("x = a + b", ("x", "expression", "a + b", False)),
        ("x = 1", ("x", "literal", "int: 1", False)),
        ("import a.b as c", ("c", "import", "a.b", False)),
        ("import a.b as c", ("c", "import_as", "c", False)),
        ("from a import b", ("b", "from_import", "a b", False)),
        ("from a import *", ("*", "from_import", "a *", False)),
        ("global x", ("x", "global", "", False)),
        ("nonlocal x", ("x", "nonlocal", "", False)),
        ("f(a)", ("f", "called", "(a)", False)),
        ("f(a)", ("a", "get", "", False)),
        ("isinstance(x, a.C)", ("x", "instance", "a.C", False)),
        ("def f(a): pass", ("a", "set", "", True)),
        ("def f(a: int): pass", ("a", "hint", "int", True)),
        ("x: int", ("x", "hint", "int", False)),
        ("return x", ("return", "equal", "x", False)),
        ("yield from x", ("yield", "equal", "from x", False)),
    ],
)
def test_records_are_decoded(source: str, expected: tuple[str, str, str, bool]) -> None:
    assert expected in records_of(source, (3, 12))


def test_a_kind_is_its_text() -> None:
    text: str = RecordKind.SET
    assert text == "set"


# ---- errors ----


def test_an_error_has_its_place_in_the_source() -> None:
    analysis = analyze("x = 1\nif (a\n    b):\n    pass\n")
    (line,) = analysis.errors
    assert isinstance(line.error, SyntaxError)
    assert line.error.msg == "invalid syntax. Perhaps you forgot a comma?"
    assert line.error_position == (2, 5)
    assert line.records == ()
    (line,) = analyze("x = 1\nif (a\n    b):\n    pass\n", exact=True).errors
    assert line.error_position == (3, 5)


@pytest.mark.parametrize(
    ("source", "missing"),
    [
        ("def add(self, item, count=1)\n    pass\n", "expected ':'"),
        ("x = f(a\n", "'(' was never closed"),
        ("x = (a]\n", "expected ')'"),
        ("for x y:\n", "expected 'in'"),
    ],
)
def test_an_error_says_what_is_missing(source: str, missing: str, tmp_path: Path) -> None:
    analysis = analyze(source, exact=True)
    (line,) = analysis.errors
    assert line.error is not None
    assert line.error.msg == f"invalid syntax: {missing}"
    path = tmp_path / "a.py"
    path.write_text(source)
    (result,) = quillet.analyze_files([path], exact=True)
    assert result.errors == [(*(line.error_position or ()), line.error.msg)]

    # An analyzer of quillet.tarvex has the same error without those words.
    head = GetLogicalsFromText(source)[0]
    bare = analysis.analyzer.AnalyzeSingleLogical(head, False)
    assert bare is not None
    assert bare.msg == "invalid syntax"
    assert (bare.filename, bare.lineno, bare.offset, bare.text) == (
        line.error.filename,
        line.error.lineno,
        line.error.offset,
        line.error.text,
    )


def test_a_bad_statement_spoils_no_other() -> None:
    assert names_set("a = 1\nb = = 2\nc = 3\n") == ["a", "c"]


def test_a_line_without_an_error_has_no_error_position() -> None:
    assert analyze("x = 1").lines[0].error_position is None


# ---- what 2.7 asks of its language ----

PRINT_FUNCTION = "from __future__ import print_function\nprint(a, file=b)\n"


def test_the_print_function_of_2_7_is_a_call() -> None:
    lines = analyze(PRINT_FUNCTION, version=(2, 7)).lines
    assert [line.error for line in lines] == [None, None]
    assert {(record.name, record.kind) for record in lines[1].records} == {
        (name, RecordKind.GET) for name in ("print", "a", "b")
    }


def test_without_the_import_print_is_a_statement_in_2_7() -> None:
    head, call = analyze("from __future__ import division\nprint(a, file=b)\n", version=(2, 7)).lines
    assert head.error is None
    assert isinstance(call.error, SyntaxError)
    assert analyze("print >>f, x\n", version=(2, 7)).lines[0].error is None


def test_the_grammar_with_the_print_function_is_that_of_2_7_less_the_statement() -> None:
    folder = "resources/pgen-grammars/Python-Grammar-2.7"
    plain = ParserGenerator(GetNorvaFilename(folder)).make_grammar().symbol2number
    other = ParserGenerator(GetNorvaFilename(folder + "-print-function")).make_grammar().symbol2number
    assert set(plain) - set(other) == {"print_stmt"}
    assert set(other) < set(plain)


def test_a_line_is_made_once_and_keeps_what_was_read() -> None:
    lines = analyze(SOURCE).lines
    first = lines[0]
    assert all(line is lines[index] for index, line in enumerate(lines))
    assert lines[0] is first
    assert first.records is first.records
    assert first.logical is first.logical
    error = analyze("x = (1 2)").lines[0]
    assert error.error is not None
    assert error.error is error.error


def test_a_line_outlives_its_analysis() -> None:
    line = analyze("x = f(a)").lines[0]
    gc.collect()
    assert [record.name for record in line.records] == ["x", "x", "f", "f", "a"]
    assert (line.first_line, line.last_line, line.indent) == (1, 1, 0)


def test_only_a_source_makes_lines() -> None:
    kind = type(analyze("x").lines[0])
    makers: list[Callable[[], object]] = [
        kind,
        lambda: object.__new__(kind),
        lambda: copy.copy(analyze("x").lines[0]),
    ]
    for make in makers:
        with pytest.raises(TypeError):
            make()


def test_a_line_in_a_ring_with_its_error_is_let_go_of() -> None:
    class Witness:
        pass

    line = analyze("x = (1 2)").lines[0]
    witness = Witness()
    line.error.ring = line, witness  # type: ignore[union-attr]
    gone = weakref.ref(witness)
    del line, witness
    gc.collect()
    assert gone() is None
