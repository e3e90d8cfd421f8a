"""Token types, non-nested scanning, the string tokenizer, clock, logger and bits as a host calls them."""

from __future__ import annotations

import gc
import logging
import math
import struct
import sys

import pytest

from quillet import _fastaccess, analyze

# ---- token types ----


@pytest.mark.parametrize(
    ("text", "name"),
    [
        ("x", "NAME"),
        ("if", "NAME"),
        ("é", "NAME"),
        ("1.5e3j", "NUMBER"),
        ("ur'x'", "STRING"),
        ("'''a\nb'''", "STRING"),
        ("f'{a}'", "STRING"),
        ("# c", "COMMENT"),
        ("\\", "BACKSLASH"),
        ("\n", "NEWLINE"),
        ("->", "RARROW"),
        ("@=", "ATEQUAL"),
        ("<>", "NOTEQUAL"),
        ("!=", "NOTEQUAL"),
        (":=", "COLONEQUAL"),
        ("...", "ELLIPSIS"),
        ("await", "NAME"),
        ("async", "NAME"),
        ("$", "ERRORTOKEN"),
        ("'open", "ERRORTOKEN"),
        ("a b", "ERRORTOKEN"),
        ("", "ERRORTOKEN"),
    ],
)
def test_token_types(text, name):
    expected = getattr(_fastaccess, f"kTokenId_{name}")
    assert _fastaccess.GetTokenType(text) == expected
    assert _fastaccess.GetTokenType(text.encode()) == expected


@pytest.mark.parametrize("wrong", [None, 1, bytearray(b"a")])
def test_a_token_is_text(wrong):
    with pytest.raises(TypeError, match="Expected"):
        _fastaccess.GetTokenType(wrong)


FIXED_IDS = {
    "ENDMARKER": 0,
    "NAME": 1,
    "NUMBER": 2,
    "STRING": 3,
    "NEWLINE": 4,
    "COLON": 11,
    "COMMA": 12,
    "DOT": 23,
    "AT": 50,
    "RARROW": 51,
    "ELLIPSIS": 52,
    "COLONEQUAL": 53,
    "AWAIT": 55,
    "ASYNC": 56,
    "COMMENT": 202,
    "BACKSLASH": 203,
}


def test_fixed_token_numbers():
    for name, number in FIXED_IDS.items():
        value = getattr(_fastaccess, f"kTokenId_{name}")
        assert value == number
        assert type(value) is int


def test_the_last_name_of_a_number_is_its_name():
    prefix = "kTokenId_"
    names = {value: name[len(prefix) :] for name, value in vars(_fastaccess).items() if name.startswith(prefix)}
    assert names[51] == "RARROW"
    assert names[29] == "NOTEQUAL"
    assert all(0 <= number < 256 for number in names)


def test_operators_have_the_numbers_of_the_pgen_driver():
    grammar = pytest.importorskip("lib2to3.pgen2.grammar")
    for text, number in grammar.opmap.items():
        if text not in ("->", ":="):  # this system numbers these on its own
            assert _fastaccess.GetTokenType(text) == number, text


# ---- tokenizer ----


def tokens_of(text):
    tokenizer = _fastaccess.CStringTokenizer(text)
    found = []
    while not tokenizer.IsAtEnd():
        found.append((tokenizer.GetToken(), tokenizer.GetUtf8Offset(), tokenizer.GetBracketDepth()))
        tokenizer.Advance()
    return found


def test_the_tokenizer_gives_tokens_offsets_and_depths():
    assert tokens_of(b"(a, [b]) -> c") == [
        ("(", 0, 0),
        ("a", 1, 1),
        (",", 2, 1),
        ("[", 4, 1),
        ("b", 5, 2),
        ("]", 6, 2),
        (")", 7, 1),
        ("->", 9, 0),
        ("c", 12, 0),
    ]


def test_the_tokenizer_counts_bytes():
    assert tokens_of("é x".encode()) == [("é", 0, 0), ("x", 3, 0)]
    assert tokens_of("é x") == [("é", 0, 0), ("x", 3, 0)]


def test_the_tokenizer_stays_at_its_end():
    tokenizer = _fastaccess.CStringTokenizer(b"ab")
    assert tokenizer.GetTokenType() == _fastaccess.kTokenId_NAME
    tokenizer.Advance()
    for _ in range(2):
        assert tokenizer.IsAtEnd()
        assert tokenizer.GetToken() is None
        assert tokenizer.GetTokenType() == _fastaccess.kTokenId_ENDMARKER
        assert tokenizer.GetUtf8Offset() == 2
        tokenizer.Advance()


@pytest.mark.parametrize("text", [b"", b"  ", b"\n"])
def test_a_text_without_tokens_is_at_its_end(text):
    assert _fastaccess.CStringTokenizer(text).IsAtEnd()


def test_the_tokenizer_takes_text():
    for wrong in (None, 1):
        with pytest.raises(TypeError):
            _fastaccess.CStringTokenizer(wrong)


# ---- non-nested search ----


def find_all(text, pattern, start=0, end=None):
    search = _fastaccess.CNonNestedSearch()
    end = len(text if isinstance(text, bytes) else text.encode()) if end is None else end
    assert search.InitWith(text, pattern, start, end) == 0
    found = []
    while (at := search.FindNext()) >= 0:
        found.append(at)
    assert search.FindNext() == -1
    return found


@pytest.mark.parametrize(
    ("text", "pattern", "expected"),
    [
        ("a, (b, c), d", b",", [1, 9]),
        (b"a, (b, c), d", b",", [1, 9]),
        ("'a,b', \"c,d\", e", b",", [5, 12]),
        ("'''a',b''', c", b",", [10]),
        ("a, b", b"", []),
        ("a -", b"->", []),
        ("a -> b -> c", b"->", [2, 7]),
        ("a), b, c", b",", []),
        ("(a, b], c", b",", [6]),
        ("f(x)", b"(", [1]),
        ("x) y", b")", [1]),
        ("é, x", b",", [2]),
        ("a, 'b, c", b",", [1]),
    ],
)
def test_search_outside_brackets_and_strings(text, pattern, expected):
    assert find_all(text, pattern) == expected


def test_search_does_not_look_past_its_end():
    assert find_all("a ->", b"->", 0, 3) == []
    assert find_all("a,b,c,d", b",", 2, 5) == [3]


def test_a_search_that_was_never_begun_finds_nothing():
    assert _fastaccess.CNonNestedSearch().FindNext() == -1


def test_a_cleared_search_finds_nothing():
    search = _fastaccess.CNonNestedSearch()
    search.InitWith("a, b", b",", 0, 4)
    search.Clear()
    assert search.FindNext() == -1


def test_a_search_lets_go_of_its_objects_at_its_end():
    text, pattern = b"x" * 1000, b"," * 2
    search = _fastaccess.CNonNestedSearch()
    before = sys.getrefcount(text), sys.getrefcount(pattern)
    search.InitWith(text, pattern, 0, 1000)
    assert (sys.getrefcount(text), sys.getrefcount(pattern)) == (before[0] + 1, before[1] + 1)
    assert search.FindNext() == -1
    assert (sys.getrefcount(text), sys.getrefcount(pattern)) == before


def test_a_search_keeps_its_objects_alive():
    search = _fastaccess.CNonNestedSearch()
    search.InitWith(b"a" * 100000 + b",", bytes([44]), 0, 100001)
    gc.collect()
    assert search.FindNext() == 100000


@pytest.mark.parametrize(("start", "end"), [(-1, 2), (0, 4), (4, 3), (0, -1)])
def test_bounds_lie_within_the_text(start, end):
    with pytest.raises(AssertionError):
        _fastaccess.CNonNestedSearch().InitWith("abc", b"b", start, end)
    with pytest.raises(AssertionError):
        _fastaccess.InitNonNestedStruct(_fastaccess.tNonNestedStruct(), "abc", b"b", start, end)


def test_bounds_count_up_to_the_first_nul():
    with pytest.raises(AssertionError):
        _fastaccess.CNonNestedSearch().InitWith(b"ab\0cd", b"c", 0, 5)


def test_the_types_of_a_search():
    search = _fastaccess.CNonNestedSearch()
    with pytest.raises(TypeError, match=r"^expected bytes, NoneType found$"):
        search.InitWith("abc", None, 0, 3)
    with pytest.raises(TypeError, match=r"^expected bytes, str found$"):
        search.InitWith("abc", "b", 0, 3)
    for wrong in (None, 1, bytearray(b"abc")):
        with pytest.raises(TypeError, match=rf"^Expected str, got {type(wrong).__name__}$"):
            search.InitWith(wrong, b"b", 0, 3)


def test_the_record_of_a_search():
    record = _fastaccess.tNonNestedStruct()
    assert _fastaccess.FindNextNonNestedStruct(record) == -1
    _fastaccess.InitNonNestedStruct(record, "a, (b", b",", 0, 5)
    assert (record.text, record.find, record.find_len, record.first_byte) == (b"a, (b", b",", 1, ord(","))
    assert (record.pos, record.end, record.depth) == (0, 5, 0)
    assert _fastaccess.FindNextNonNestedStruct(record) == 1
    assert record.pos == 2
    assert _fastaccess.FindNextNonNestedStruct(record) == -1
    assert (record.pos, record.depth) == (5, 1)
    _fastaccess.InitNonNestedStruct(record, "a)", b",", 0, 2)
    assert _fastaccess.FindNextNonNestedStruct(record) == -1
    assert record.depth == -1
    _fastaccess.InitNonNestedStruct(record, "a", b"", 0, 1)
    assert (record.find_len, record.end) == (0, 0)


def test_the_end_of_a_string():
    record = _fastaccess.tNonNestedStruct()
    _fastaccess.InitNonNestedStruct(record, "x 'a\\'b' '''c''d''' 'open", b",", 0, 25)
    assert _fastaccess._FindStringEndNonNested(record, 2) == 8
    assert _fastaccess._FindStringEndNonNested(record, 9) == 19
    assert _fastaccess._FindStringEndNonNested(record, 20) == 25
    for wrong in (0, 25, -1):
        with pytest.raises(ValueError, match=r"^No string literal starts at position"):
            _fastaccess._FindStringEndNonNested(record, wrong)


@pytest.mark.parametrize("kind", [str, str.encode, lambda text: bytearray(text.encode())])
def test_the_next_item(kind):
    text = kind("a(b, [c], ')')d'e'")
    step = _fastaccess.NextNonNestedUtf8PtrIndex
    assert [step(text, pos, 18) for pos in (0, 1, 14, 15)] == [1, 14, 15, 18]
    assert step(text, 18, 18) == -1
    assert step(text, 99, 99) == -1
    with pytest.raises(IndexError):
        step(text, -1, 18)
    assert _fastaccess._NonInlineNextNonNestedUtf8PtrIndex(text, 1, 18) == 14
    assert _fastaccess._NonInlineNextNonNestedUtf8PtrIndex(text, 1, 5) == 5
    assert _fastaccess._NonInlineNextNonNestedUtf8PtrIndex(text, 18, 18) == -1


# ---- clock ----


def test_the_past_is_out_of_time_and_the_future_is_not():
    now = _fastaccess.GetNowTime()
    assert _fastaccess.OutOfTime(now - 1e6)
    assert not _fastaccess.OutOfTime(now + 1e6)
    assert _fastaccess.OutOfTime(float("-inf"))
    assert not _fastaccess.OutOfTime(float("nan"))


def test_a_test_may_replace_the_clock(monkeypatch):
    monkeypatch.setattr(_fastaccess, "__TimeFunc", lambda: 100)
    assert _fastaccess.GetNowTime() == 100.0
    assert isinstance(_fastaccess.GetNowTime(), float)
    assert _fastaccess.OutOfTime(100.0), "the very moment counts"
    assert not _fastaccess.OutOfTime(100.5)


def test_a_clock_may_show_minus_one(monkeypatch):
    monkeypatch.setattr(_fastaccess, "__TimeFunc", lambda: -1.0)
    assert _fastaccess.GetNowTime() == -1.0
    assert _fastaccess.OutOfTime(-1.0)


def test_the_failure_of_a_clock_goes_to_its_caller(monkeypatch):
    def broken():
        raise OSError("no clock")

    monkeypatch.setattr(_fastaccess, "__TimeFunc", broken)
    with pytest.raises(OSError, match="no clock"):
        _fastaccess.GetNowTime()
    with pytest.raises(OSError, match="no clock"):
        _fastaccess.OutOfTime(0)
    monkeypatch.setattr(_fastaccess, "__TimeFunc", lambda: "late")
    with pytest.raises(TypeError):
        _fastaccess.GetNowTime()


def test_an_end_time_is_a_number():
    with pytest.raises(TypeError):
        _fastaccess.OutOfTime("now")


# ---- logger ----


def test_each_entry_goes_to_its_own_operation():
    class Logger(_fastaccess.CLogger):
        def __init__(self):
            self.seen = []

        def Log1(self, s, args=()):
            self.seen.append((1, s % args))

        def Log(self, level, s, args):
            self.seen.append((level, s % args))

    logger = Logger()
    logger.Log1("one %s", ("a",))
    logger.Log2("two %s", ("b",))
    logger.Log3("three")
    assert logger.seen == [(1, "one a"), (logging.INFO, "two b"), (logging.WARNING, "three")]


def test_entries_reach_the_hosts_logging(caplog):
    caplog.set_level(logging.DEBUG, logger="quillet")
    logger = _fastaccess.CLogger()
    logger.Log1("at %d", (1,))
    logger.Log2("at %d", (2,))
    logger.Log3("100%")
    assert caplog.record_tuples == [
        ("quillet", logging.DEBUG, "at 1"),
        ("quillet", logging.INFO, "at 2"),
        ("quillet", logging.WARNING, "100%"),
    ]


# ---- bits ----


def test_bits_of_floats():
    assert _fastaccess.ULongLongValueForDoubleBits(1.0) == 0x3FF0000000000000
    assert _fastaccess.DoubleValueForULongLongBits(0x3FF0000000000000) == 1.0
    for value in (0.0, -0.0, 1.5, -2.25, math.inf, 5e-324, sys.float_info.max):
        bits = _fastaccess.ULongLongValueForDoubleBits(value)
        assert bits == struct.unpack("<Q", struct.pack("<d", value))[0]
        assert math.copysign(1, _fastaccess.DoubleValueForULongLongBits(bits)) == math.copysign(1, value)
        assert _fastaccess.DoubleValueForULongLongBits(bits) == value


def test_the_bits_of_a_nan_go_through_unchanged():
    bits = 0x7FF800000000ABCD
    value = _fastaccess.DoubleValueForULongLongBits(bits)
    assert math.isnan(value)
    assert _fastaccess.ULongLongValueForDoubleBits(value) == bits


def test_too_many_bits():
    assert _fastaccess.DoubleValueForPyIntBits(1 << 64) == 0.0
    assert _fastaccess.DoubleValueForPyIntBits((1 << 64) + 0x3FF0000000000000) == 1.0
    assert _fastaccess.DoubleValueForPyIntBits(-(1 << 63)) == 0.0
    assert math.isnan(_fastaccess.DoubleValueForPyIntBits(-1))
    for wrong in (1 << 64, -1, 1 << 200):
        with pytest.raises(OverflowError):
            _fastaccess.DoubleValueForULongLongBits(wrong)
    for function in (_fastaccess.DoubleValueForULongLongBits, _fastaccess.DoubleValueForPyIntBits):
        with pytest.raises(TypeError):
            function("1")
    with pytest.raises(TypeError):
        _fastaccess.ULongLongValueForDoubleBits("1")


def test_locations_are_equal_if_they_are_the_same():
    first, second = [1], [1]
    assert _fastaccess.LocationsEqual(first, first)
    assert not _fastaccess.LocationsEqual(first, second)
    assert _fastaccess.LocationsEqual(None, None)


def test_bytes_in_bytes():
    assert _fastaccess.StrInStr(b"b", b"abc")
    assert not _fastaccess.StrInStr(b"x", b"abc")
    assert _fastaccess.StrInStr(b"", b"abc")
    assert _fastaccess.StrInStr(b"", b"")
    assert not _fastaccess.StrInStr(b"c", b"ab\0c")
    assert _fastaccess.StrInStr(b"b\0x", b"abc")


@pytest.mark.parametrize(("sub", "whole"), [("b", "abc"), (b"b", "abc"), ("b", b"abc"), (None, b"abc"), (b"b", None)])
def test_bytes_in_bytes_takes_bytes(sub, whole):
    with pytest.raises(TypeError, match=r"^Both sub and whole must be strings$"):
        _fastaccess.StrInStr(sub, whole)


def test_classes_of_bytes():
    for code in range(256):
        ascii_char = chr(code) if code < 128 else " "
        assert _fastaccess.IsDigit(code) == (ascii_char in "0123456789")
        assert _fastaccess.IsAlnum(code) == ascii_char.isalnum()
    for code in (255, 256 + ord("5"), 10**9, -1):
        assert not _fastaccess.IsDigit(code)
        assert not _fastaccess.IsAlnum(code)


# ---- tuples ----


def test_what_is_made_as_a_tuple_is_one_to_the_interpreter() -> None:
    comment, statement = analyze("# a comment\nx = y\n").lines
    # There is but one that is empty.
    empty: tuple[object, ...] = ()
    assert comment.records is empty
    record = statement.records[0]
    assert hash(record) == hash(tuple(record))
    assert {record: 1}[tuple(record)] == 1  # type: ignore[index]
