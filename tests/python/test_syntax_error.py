"""Where a syntax error points."""

from __future__ import annotations

from types import SimpleNamespace

import pytest

from quillet.logicalline import CLogicalLine
from quillet.optpgen import ParseError
from quillet.strutils import TextPosInfo
from quillet.tarvex import CreateSyntaxError

TWO = CLogicalLine(toks=("x =", "foo"), positions=((0, 0), (0, 4)))
PLAIN = SimpleNamespace(fTokenCount=2, fToks=["x =", "foo"], fPositions=[(0, 0), (0, 4)])


@pytest.mark.parametrize("line", [TWO, PLAIN], ids=["CLogicalLine", "any object"])
@pytest.mark.parametrize(
    ("context", "place"),
    [(0, (1, 1)), (1, (1, 5)), (2, (1, 8)), (1 << 40, (1, 8)), (-1, (1, 5)), ((5, 7), (6, 8))],
)
def test_a_context_is_an_index_or_a_position(line: object, context: object, place: tuple[int, int]) -> None:
    error = CreateSyntaxError("message", line, context)
    assert type(error) is SyntaxError
    assert error.args == ("message", ("<string>", *place, "x = foo"))


def test_an_empty_line_gives_the_beginning() -> None:
    error = CreateSyntaxError("m", CLogicalLine(), 3)
    assert error.args == ("m", ("<string>", 1, 1, ""))
    assert CreateSyntaxError("m", CLogicalLine(), "anything").args == error.args


@pytest.mark.parametrize(
    ("position", "lineno", "utf8_col", "place"),
    [((0, 10), 0, 3, (1, 14)), ((1, 10), 2, 3, (4, 4))],
)
def test_a_place_inside_the_token(
    position: tuple[int, int], lineno: int, utf8_col: int, place: tuple[int, int]
) -> None:
    line = CLogicalLine(toks=("token",), positions=(position,))
    error = CreateSyntaxError("m", line, 0, TextPosInfo(lineno, -1, utf8_col))
    assert (error.lineno, error.offset) == place
    same = CreateSyntaxError("m", line, 0, pos_info_in_tok=SimpleNamespace(lineno=lineno, utf8_col=utf8_col))
    assert (same.lineno, same.offset) == place


def test_the_offset_behind_the_last_token_counts_bytes() -> None:
    line = CLogicalLine(toks=("é",), positions=((0, 2),))
    assert CreateSyntaxError("m", line, 1).offset == 5


@pytest.mark.parametrize(
    ("context", "error"),
    [(-3, IndexError), ((1, 2, 3), ValueError), ((1,), ValueError), ("0", TypeError), (None, TypeError)],
)
def test_contexts_that_point_nowhere(context: object, error: type[Exception]) -> None:
    with pytest.raises(error):
        CreateSyntaxError("m", TWO, context)


def test_a_position_is_a_pair() -> None:
    line = SimpleNamespace(fTokenCount=1, fToks=["x"], fPositions=[(0, 0, 0)])
    with pytest.raises(ValueError, match="too many values"):
        CreateSyntaxError("m", line, 0)


def test_a_parse_error_carries_what_it_was_made_of() -> None:
    error = ParseError("bad input", 1, "x", 4)
    assert (error.msg, error.type, error.value, error.context) == ("bad input", 1, "x", 4)
    assert str(error) == "bad input: type=1, value='x', context=4"
