"""UTF-8 text primitives as a host calls them."""

from __future__ import annotations

import sys
import unicodedata

import pytest

from quillet import strutils

KINDS_OF_TEXT = [
    pytest.param(lambda text: text, id="str"),
    pytest.param(lambda text: text.encode(), id="bytes"),
    pytest.param(lambda text: bytearray(text.encode()), id="bytearray"),
]


class Buffer(bytearray):
    pass


# ---- positions ----


@pytest.mark.parametrize("kind", KINDS_OF_TEXT)
def test_adjust_steps_over_a_two_byte_letter(kind):
    text = kind("aé ")
    assert strutils.AdjustUtf8Pos(text, 0, 2, 4) == 3
    assert strutils.AdjustUtf8Pos(text, 2, 0, 4) == 1
    assert strutils.AdjustUtf8Pos(text, 3, -1, 4) == 1
    assert strutils.AdjustUtf8Pos(text, 0, -1, 4) == -1
    assert strutils.AdjustUtf8Pos(text, 0, 100, 4) == 4


def test_adjust_reads_nothing_outside_the_text():
    assert strutils.AdjustUtf8Pos("aé ", 0, 100, 1000) == 4
    assert strutils.AdjustUtf8Pos("aé ", 1000, -1, 1000) == 3
    assert strutils.AdjustUtf8Pos("aé ", 2**62, -2, 4) == 1
    assert strutils.AdjustUtf8Pos("", 0, -1, 0) == -1
    assert strutils.AdjustUtf8Pos("aé ", 4, 0, 4) == 4


def test_adjust_counts_what_stands_behind_the_end_going_backward():
    assert strutils.AdjustUtf8Pos(b"abcdef", 5, -1, 3) == 4
    assert strutils.AdjustUtf8Pos(b"abc", 4, -1, 3) == 2
    assert strutils.AdjustUtf8Pos("aé ", 3, -1, 0) == 1


@pytest.mark.parametrize("kind", KINDS_OF_TEXT)
def test_a_character_at_the_end_is_zero(kind):
    text = kind("aé")
    assert strutils.Ucs4CharAtUtf8Pos(text, 0, 3) == ord("a")
    assert strutils.Ucs4CharAtUtf8Pos(text, 1, 3) == ord("é")
    assert strutils.Ucs4CharAtUtf8Pos(text, 3, 3) == 0
    assert strutils.Ucs4CharAtUtf8Pos(text, 0, 0) == 0
    assert strutils.Ucs4CharAtUtf8Pos(text, 9, 99) == 0


@pytest.mark.parametrize("function", [strutils.Ucs4CharAtUtf8Pos, strutils._NonInlineUcs4CharAtUtf8Pos])
@pytest.mark.parametrize("malformed", [b"\xff", b"\x80", b"\xc3", b"\xed\xa0\x80", b"\xc0\x80", b"\xf5\x80\x80\x80"])
def test_a_malformed_character_is_an_error(function, malformed):
    with pytest.raises(ValueError, match="position 1"):
        function(b"a" + malformed, 1, 1 + len(malformed))


def test_a_position_in_front_of_the_text_is_an_error():
    for function in (
        strutils.Ucs4CharAtUtf8Pos,
        strutils._NonInlineUcs4CharAtUtf8Pos,
        strutils.IsSpaceAtUtf8Pos,
        strutils.IsDigitAtUtf8Pos,
        strutils.IsAlnumAtUtf8Pos,
    ):
        with pytest.raises(IndexError):
            function("abc", -1, 3)
    with pytest.raises(IndexError):
        strutils.IsIdentifierCharAtUtf8Pos("abc", -1, 3, True)


def test_the_decoder_of_long_characters_needs_one():
    assert strutils._NonInlineUcs4CharAtUtf8Pos("é", 0, 2) == ord("é")
    assert strutils._NonInlineUcs4CharAtUtf8Pos("😀", 0, 4) == ord("😀")
    with pytest.raises(IndexError):
        strutils._NonInlineUcs4CharAtUtf8Pos("é", 2, 2)


# ---- classifiers ----


@pytest.mark.parametrize("kind", KINDS_OF_TEXT)
def test_a_digit_begins_no_identifier(kind):
    assert not strutils.IsIdentifierCharAtUtf8Pos(kind("1"), 0, 1, True)
    assert strutils.IsIdentifierCharAtUtf8Pos(kind("1"), 0, 1, False)


def test_classifiers_are_false_at_the_end():
    assert not strutils.IsSpaceAtUtf8Pos(" ", 1, 1)
    assert not strutils.IsDigitAtUtf8Pos("1", 1, 1)
    assert not strutils.IsAlnumAtUtf8Pos("a", 0, 0)
    assert not strutils.IsIdentifierCharAtUtf8Pos("a", 1, 5, False)


def test_classifiers_follow_the_c_locale_for_ascii():
    for code in range(128):
        char = chr(code)
        assert strutils.IsSpaceAtUtf8Pos(char, 0, 1) == (char in " \t\n\v\f\r")
        assert strutils.IsDigitAtUtf8Pos(char, 0, 1) == ("0" <= char <= "9")
        assert strutils.IsAlnumAtUtf8Pos(char, 0, 1) == char.isalnum()
        assert strutils.IsIdentifierCharAtUtf8Pos(char, 0, 1, True) == (char.isalpha() or char == "_")
        assert strutils.IsIdentifierCharAtUtf8Pos(char, 0, 1, False) == (char.isalnum() or char == "_")


def test_classifiers_follow_the_host_beyond_ascii():
    for code in range(128, sys.maxunicode + 1):
        if 0xD800 <= code < 0xE000:
            continue
        char = chr(code)
        if code > 0x3000 and unicodedata.category(char) in ("Cn", "Co") and code % 97:
            continue  # the empty planes are all alike
        utf8 = char.encode()
        end = len(utf8)
        assert strutils.IsSpaceAtUtf8Pos(utf8, 0, end) == char.isspace(), code
        assert strutils.IsDigitAtUtf8Pos(utf8, 0, end) == char.isdigit(), code
        assert strutils.IsAlnumAtUtf8Pos(utf8, 0, end) == char.isalnum(), code
        starts = char.isidentifier()
        assert strutils.IsIdentifierCharAtUtf8Pos(utf8, 0, end, True) == starts, code
        assert strutils.IsIdentifierCharAtUtf8Pos(utf8, 0, end, False) == (starts or char.isdigit()), code


def test_classifiers_report_malformed_bytes():
    for function in (strutils.IsSpaceAtUtf8Pos, strutils.IsDigitAtUtf8Pos, strutils.IsAlnumAtUtf8Pos):
        with pytest.raises(ValueError, match=r"^Invalid UTF-8 at position 0$"):
            function(b"\xff", 0, 1)
    with pytest.raises(ValueError, match=r"^Invalid UTF-8 at position 0$"):
        strutils.IsIdentifierCharAtUtf8Pos(b"\xff", 0, 1, True)


# ---- bytes of a text ----


def test_the_bytes_of_every_kind_of_text():
    assert strutils.GetUtf8Ptr("é") == b"\xc3\xa9"
    assert strutils.GetUtf8Ptr(b"\xff") == b"\xff"
    assert strutils.GetUtf8Ptr(bytearray(b"ab")) == b"ab"
    assert strutils.GetUtf8Ptr(bytearray()) == b""
    assert strutils.GetUtf8Ptr(Buffer(b"xyz")) == b"xyz"


@pytest.mark.parametrize("wrong", [None, 1, ["a"], memoryview(b"a")])
def test_anything_else_is_no_text(wrong):
    with pytest.raises(TypeError, match=f"Expected str, got {type(wrong).__name__}"):
        strutils.GetUtf8Ptr(wrong)
    with pytest.raises(TypeError, match="Expected"):
        strutils.Ucs4CharAtUtf8Pos(wrong, 0, 1)


def test_positions_are_integers():
    with pytest.raises(TypeError):
        strutils.Ucs4CharAtUtf8Pos("a", "0", 1)
    with pytest.raises(TypeError):
        strutils.AdjustUtf8Pos("a", 0, 1.0, 1)


# ---- searches ----


def test_find_a_byte():
    assert strutils.PtrFindByte(b"abcabc", 6, ord("b"), 0) == 1
    assert strutils.PtrFindByte("abcabc", 6, ord("b"), 2) == 4
    assert strutils.PtrFindByte(b"abcabc", 3, ord("c"), 0) == 2
    assert strutils.PtrFindByte(b"abcabc", 6, ord("x"), 0) == -1
    assert strutils.BytesFindByte(b"abcabc", ord("c")) == 2
    assert strutils.BytesFindByte(b"abcabc", ord("c"), 3) == 5
    assert strutils.BytesFindByte(b"a\xff", 0xFF) == 1


@pytest.mark.parametrize("start", [6, 7, -1, 2**62])
def test_a_start_outside_the_bytes_is_an_error(start):
    with pytest.raises(ValueError, match=r"^Invalid start$"):
        strutils.PtrFindByte(b"abcabc", 6, ord("a"), start)
    with pytest.raises(ValueError, match=r"^Invalid start$"):
        strutils.BytesFindByte(b"abcabc", ord("a"), start)


def test_an_empty_buffer_has_no_start():
    with pytest.raises(ValueError, match=r"^Invalid start$"):
        strutils.PtrFindByte(b"", 0, ord("a"), 0)
    with pytest.raises(ValueError, match=r"^Invalid start$"):
        strutils.BytesFindByte(b"", ord("a"))


def test_a_length_past_the_buffer_is_an_error():
    with pytest.raises(ValueError, match="Invalid length"):
        strutils.PtrFindByte(b"abc", 4, ord("a"), 0)


def test_what_is_searched_for_is_a_byte():
    for wrong in (256, -1):
        with pytest.raises(OverflowError):
            strutils.BytesFindByte(b"abc", wrong)
    with pytest.raises(TypeError):
        strutils.BytesFindByte("abc", ord("a"))


def test_the_code_of_a_character():
    assert strutils.OrdAt("aé😀", 1) == ord("é")
    assert strutils.OrdAt("aé😀", 2) == ord("😀")
    assert strutils.OrdAt("aé😀", -3) == ord("a")


@pytest.mark.parametrize(("text", "index"), [("", 0), ("", -1), ("abc", 3), ("abc", -4), ("abc", 2**62)])
def test_the_code_of_a_character_out_of_range(text, index):
    with pytest.raises(IndexError, match=r"^string index out of range$"):
        strutils.OrdAt(text, index)


@pytest.mark.parametrize("wrong", [None, b"abc", 1])
def test_the_code_of_a_character_of_no_text(wrong):
    with pytest.raises(TypeError):
        strutils.OrdAt(wrong, 0)


def test_lead_bytes():
    assert [strutils.IsUtf8LeadByte(byte) for byte in "aé€".encode()] == [True, True, False, True, False, False]
    assert strutils.IsUtf8LeadByte(0)
    with pytest.raises(OverflowError):
        strutils.IsUtf8LeadByte(256)


# ---- joining and converting ----


def test_joining_leaves_none_out():
    assert strutils.Utf8Concat5("é", b"\xff", None, "", "z") == b"\xc3\xa9\xffz"
    assert strutils.Utf8Concat5(None, None, None, None, None) == b""
    assert strutils.Utf8Concat4("a", "b", None, b"c") == b"abc"
    assert strutils.Utf8Concat3(b"a", None, "c") == b"ac"
    assert strutils.Utf8Concat2("a", None) == b"a"


@pytest.mark.parametrize("wrong", [1, bytearray(b"a"), ["a"]])
def test_joining_takes_text_and_bytes(wrong):
    with pytest.raises(TypeError, match="Expected"):
        strutils.Utf8Concat2("a", wrong)


def test_lengths_are_in_bytes():
    assert strutils.Utf8Len("aé😀") == 7
    assert strutils.Utf8Len(b"\xff\xff") == 2
    assert strutils.Utf8Len("") == 0
    with pytest.raises(TypeError):
        strutils.Utf8Len(None)


def test_conversions():
    given = b"\xff"
    assert strutils.AsUtf8(given) is given
    assert strutils.AsUtf8("é") == b"\xc3\xa9"
    text = "é"
    assert strutils.AsStr(text) is text
    assert strutils.AsStr(b"\xc3\xa9") == "é"
    assert strutils.AsStr(None) is None
    assert strutils.AsUtf8(strutils.AsStr(b"a\xff")) == b"a\xff"
    for wrong in (1, bytearray(b"a")):
        with pytest.raises(TypeError, match="Expected"):
            strutils.AsStr(wrong)
        with pytest.raises(TypeError, match="Expected"):
            strutils.AsUtf8(wrong)
    with pytest.raises(TypeError, match="Expected str, got NoneType"):
        strutils.AsUtf8(None)


@pytest.mark.parametrize("number", [0, 7, -12, 2**63 - 1, -(2**63), 2**200, True])
def test_digits(number):
    assert strutils.BytesForInteger(number) == str(int(number)).encode()


def test_digits_of_no_integer():
    with pytest.raises(TypeError):
        strutils.BytesForInteger(1.0)


def test_a_place_inside_a_text():
    nowhere = strutils.TextPosInfo()
    assert (nowhere.lineno, nowhere.char_col, nowhere.utf8_col) == (0, -1, -1)
    place = strutils.TextPosInfo(0, -1, 7)
    assert (place.lineno, place.utf8_col) == (0, 7)
    assert place == strutils.TextPosInfo(utf8_col=7)
    assert place != strutils.TextPosInfo(lineno=1, utf8_col=7)
    assert place != 7
    place.lineno = 3
    assert repr(place) == "TextPosInfo(lineno=3, char_col=-1, utf8_col=7)"


def test_a_bytearray_keeps_its_size_while_a_number_behind_it_is_converted() -> None:
    buffer = bytearray(b"abc " * 1000)

    class End:
        def __index__(self) -> int:
            with pytest.raises(BufferError):
                buffer.clear()
            return 4000

    assert strutils.IsSpaceAtUtf8Pos(buffer, 3, End())
    buffer.clear()
