"""Match and case heads as a host parses them, and the steps of the pattern parser by name."""

from __future__ import annotations

import pytest

from lines import line_of, parse, parser, shape
from quillet.optpgen import ParseError
from quillet.tarvex import CMatchCaseStatementParser


def match_parser() -> CMatchCaseStatementParser:
    return CMatchCaseStatementParser(parser((3, 12)))


def with_tokens(text: str) -> CMatchCaseStatementParser:
    line = line_of(text)
    one = match_parser()
    one._fToks = line.fToks
    one._fPositions = line.fPositions
    return one


@pytest.mark.parametrize(
    ("text", "children"),
    [
        ("case x:", 3),
        ("case x if y:", 4),
        ("case x: pass", 4),
        ("case x if y: pass", 5),
        ("case [a if_ else_]:".replace(" if_ else_", ""), 3),
        ('case {"k": v}:', 3),
        ("match x, *y:", 3),
    ],
)
def test_statements(text: str, children: int) -> None:
    node = parse(text, (3, 12))
    assert node.GetChildCount() == children
    assert node.GetChildText(0) == text.split()[0]


@pytest.mark.parametrize(
    ("pattern", "expected"),
    [
        ("_", "_"),
        ("None", "None"),
        ("-1", ("CPatternNode", "-", "1")),
        ("1 + 2j", ("CPatternNode", "1", "+", "2j")),
        ("a.b", ("CExpression", "a", ".", "b")),
        ("a | b | c", ("CPatternNode", "a", "|", "b", "|", "c")),
        ("a |", ("CPatternNode", "a", "|")),
        ("a | b as c", ("CPatternNode", ("CPatternNode", "a", "|", "b"), "as", "c")),
        ("[]", ("CSequencePatternNode", "[", "]")),
        ("[a, *rest]", ("CSequencePatternNode", "[", "a", ",", ("CPatternNode", "*", "rest"), "]")),
        ("{}", ("CSequencePatternNode", "{", "}")),
        ('{"k": v, **rest}', ("CSequencePatternNode", "{", '"k"', ":", "v", "**", "rest", "}")),
        ("Foo((a))", ("CClassPatternNode", ("CExpression", "Foo"), "(", ("CPatternNode", "(", "a", ")"))),
        (
            "Point(x=0,)",
            ("CClassPatternNode", ("CExpression", "Point"), "(", ("CClassArgumentPatternNode", "x", "=", "0"), ","),
        ),
    ],
)
def test_patterns(pattern: str, expected: object) -> None:
    assert shape(parse(f"case {pattern}:", (3, 12)).GetPattern()) == expected


@pytest.mark.parametrize(
    ("pattern", "tok_i"),
    [
        ("1 2", 2),
        ("1 + x", 3),
        ("- x", 2),
        ('"a" "b"', 1),
        ("a.", 2),
        ("(a)", 3),
        ("()", 2),
        ("{k}", 2),
        ("a as b as c", 2),
        ("a as 1", 3),
        ("a as b | c", 2),
        ("((a), (b))", 4),
        ("Point(a b=1)", 5),
    ],
)
def test_bad_patterns_point_at_a_token(pattern: str, tok_i: int) -> None:
    line = line_of(f"case {pattern}:")
    with pytest.raises(ParseError) as caught:
        match_parser().ParseCaseStmt(line.fToks, line.fPositions)
    assert caught.value.msg == "Invalid syntax"
    assert caught.value.type == 0
    assert caught.value.context == line.fPositions[tok_i]
    assert caught.value.value == line.fToks[tok_i]


@pytest.mark.parametrize("text", ["match = 1", "match(x)", "print(match)", "x = 1"])
def test_what_is_no_such_statement_gives_none(text: str) -> None:
    line = line_of(text)
    one = match_parser()
    assert one.ParseMatchStmt(line.fToks, line.fPositions) is None
    assert one.ParseCaseStmt(line.fToks, line.fPositions) is None
    assert (one._fToks, one._fPositions) == (None, None)


def test_comments_and_continuations_are_dropped_first() -> None:
    one = match_parser()
    toks = ("match", "\\", "x", ":", "# why")
    positions = ((0, 0), (0, 6), (1, 2), (1, 3), (1, 6))
    assert one._RemoveSkipToks(toks, positions) == (("match", "x", ":"), ((0, 0), (1, 2), (1, 3)))
    kept = ["a", "\\"]
    places = [(0, 0), (0, 1)]
    same_toks, same_places = one._RemoveSkipToks(kept, places)
    assert same_toks is kept
    assert same_places is places
    assert shape(one.ParseMatchStmt(toks, positions)) == ("CMatchStmt", "match", "x", ":")


def test_steps_by_name() -> None:
    one = with_tokens("case a.b, -1:")
    assert one._fToks == ("case", "a", ".", "b", ",", "-", "1", ":")
    assert one._NonNestedFindTokenIndex(",", 1, 8) == 4
    assert one._NonNestedFindTokenIndex(",", 5, 5) == -1
    assert shape(one._NodeForDottedNameValue(1, 4)) == ("CExpression", "a", ".", "b")
    assert shape(one._NodeForNumberPattern(5, 7)) == ("CPatternNode", "-", "1")
    leaf = one._TokNode(0)
    assert (leaf.fText, leaf.fContext) == ("case", (0, 0))
    error = one._ParseExceptionAt(5)
    assert isinstance(error, ParseError)
    assert (error.msg, error.type, error.value, error.context) == ("Invalid syntax", 0, "-", (0, 10))
    one._fToks = None
    assert one._fToks is None
    assert shape(with_tokens("case [x]:")._NodeForSequencePattern(1, 4)) == ("CSequencePatternNode", "[", "x", "]")
    assert shape(with_tokens("case {}:")._NodeForMappingPattern(1, 3)) == ("CSequencePatternNode", "{", "}")
    assert shape(with_tokens("case C():")._NodeForClassPattern(1, 4)) == (
        "CClassPatternNode",
        ("CExpression", "C"),
        "(",
    )
    assert shape(with_tokens("case a as b:")._NodeForPattern(1, 4)) == ("CPatternNode", "a", "as", "b")
    with pytest.raises(ParseError):
        with_tokens("case a as b:")._NodeForPattern(1, 4, False)
    assert shape(with_tokens("case x:")._ParseCaseStmtImpl()) == ("CCaseStmt", "case", "x", ":")
    assert with_tokens("case x:")._ParseMatchStmtImpl() is None


def test_construction() -> None:
    one = match_parser()
    assert one._fPGenParser is parser((3, 12))
    assert one._fNodeFactory is parser((3, 12))._fNodeFactory
    with pytest.raises(TypeError, match="Expected CPGenParserImpl, got NoneType"):
        CMatchCaseStatementParser(None)
