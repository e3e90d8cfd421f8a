"""The JSON of messages: what is plain is read and written natively, and all of it as json does."""

from __future__ import annotations

import json
from typing import Any

import pytest
from hypothesis import given
from hypothesis import strategies as st

from quillet.server.json_text import decode, encode
from quillet.tarvex import _host

_TEXTS = st.text(st.characters(exclude_categories=()), max_size=20)
_VALUES = st.recursive(
    st.none() | st.booleans() | st.integers() | st.floats(allow_nan=False) | _TEXTS,
    lambda inner: st.lists(inner, max_size=4) | st.dictionaries(_TEXTS, inner, max_size=4),
    max_leaves=20,
)


@given(_VALUES, st.booleans(), st.sampled_from([None, 1]))
def test_what_json_writes_is_read(value: Any, ascii_only: bool, indent: int | None) -> None:
    text = json.dumps(value, ensure_ascii=ascii_only, indent=indent).encode("utf-8", "surrogatepass")
    assert decode(text) == json.loads(text)


@given(_VALUES)
def test_what_is_written_is_read_by_json(value: Any) -> None:
    text = encode(value)
    assert text.isascii()
    assert json.loads(text) == value


PIECES = [
    *'{}[]:,"\\/ \n\t', "\\u", "\\ud83d", "\\ude00", "\\n", "\\x", "\\", "true", "false", "null", "nul", "-", "0", "01",
    "12", "-0", "1.5", "1e3", "9223372036854775807", "9223372036854775808", "-9223372036854775808", "NaN", '"a"',
    '"a":1', "\x01", "\x00", "é", "😀", "\ud800", "\ufeff",
]  # fmt: skip


@given(st.lists(st.sampled_from(PIECES), max_size=8).map("".join))
def test_any_text_is_what_json_says_it_is(text: str) -> None:
    given_text = text.encode("utf-8", "surrogatepass")
    assert said(decode, given_text) == said(json.loads, given_text)


def said(read: Any, text: bytes) -> Any:
    try:
        value = read(text)
    except ValueError as error:
        return type(error), str(error)
    return "NaN" if value != value else (type(value), value)


@pytest.mark.parametrize(
    ("text", "value"),
    [
        (b'{"a":[1,-2,true,false,null,"b"],"c":{}}', {"a": [1, -2, True, False, None, "b"], "c": {}}),
        (rb'"\"\\\/\b\f\n\r\t\u00e9\ud83d\ude00"', '"\\/\b\f\n\r\té😀'),
        ('"é😀"'.encode(), "é😀"),
        (rb'"\ud800\u0041"', "\ud800A"),
        (b" [ ] ", []),
        (b'{"a":1,"a":2}', {"a": 2}),
    ],
)
def test_plain_text_is_read_natively(text: bytes, value: Any) -> None:
    assert _host.ReadJson(text) == value


@pytest.mark.parametrize(
    "text",
    [b"1.5", b"1e3", b"9" * 19, b"01", b"", b"[1", b"[1]]", b'"\xff"', b"\xef\xbb\xbf1", b"[" * 300 + b"]" * 300],
)
def test_other_text_is_left_to_json(text: bytes) -> None:
    with pytest.raises(ValueError, match=r"."):
        _host.ReadJson(text)


def test_a_value_that_is_not_plain_is_left_to_json() -> None:
    circle: list[Any] = []
    circle.append(circle)
    for value in (1.5, 1 << 70, {1: 2}, "\ud800", circle, object()):
        with pytest.raises(TypeError):
            _host.WriteJson(value)
    assert encode([1.5, 1 << 70, {1: 2}, "\ud800"]) == rb'[1.5,1180591620717411303424,{"1":2},"\ud800"]'
    with pytest.raises(ValueError, match="Circular"):
        encode(circle)
    with pytest.raises(TypeError):
        encode(object())


def test_what_is_nested_too_deeply_is_said_as_json_says_it() -> None:
    with pytest.raises(RecursionError):
        decode(b"[" * 100_000)
