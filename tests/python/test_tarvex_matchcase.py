"""Match and case heads as a host parses them, and the steps of the pattern parser by name."""

from __future__ import annotations

import gc
import weakref
from collections.abc import Callable

import pytest

from lines import line_of, parse, parser, shape
from quillet.optpgen import ParseError
from quillet.tarvex import CMatchCaseStatementParser, CNode, CPGenParserImpl


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
        ("case [x] if [a if b else c]:", 4),
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
        ("[a if b else c]", 3),  # an "if" in brackets is no guard's
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


# ---- what the host puts in place ----


def test_a_failed_step_leaves_the_tokens_as_they_were() -> None:
    one = with_tokens("match x y:")
    for _ in range(2):
        with pytest.raises(ParseError) as caught:
            one._ParseMatchStmtImpl()
        assert (caught.value.value, caught.value.context) == ("y", 2)
    assert one._TokNode(0).fText == "match"
    assert one._TokNode(-1).fText == ":"


def test_a_statement_leaves_no_tokens_in_place() -> None:
    line = line_of("match x:")
    bad = line_of("case 1 2:")
    one = with_tokens("case x:")
    assert one.ParseMatchStmt(line.fToks, line.fPositions) is not None
    assert (one._fToks, one._fPositions) == (None, None)
    one._fToks, one._fPositions = line.fToks, line.fPositions
    with pytest.raises(ParseError):
        one.ParseCaseStmt(bad.fToks, bad.fPositions)
    assert (one._fToks, one._fPositions) == (None, None)
    # The parser's own serves its statements, too.
    mine = CPGenParserImpl((3, 12))
    own = mine._fMatchCaseStatementParser
    own._fToks, own._fPositions = line.fToks, line.fPositions
    assert shape(mine.ParseToNode(line_of("case x:"), False)) == ("CCaseStmt", "case", "x", ":")
    assert (own._fToks, own._fPositions) == (None, None)
    with pytest.raises(TypeError):
        own._TokNode(0)


def test_without_tokens_a_step_is_a_type_error() -> None:
    one = match_parser()
    steps: list[Callable[[], object]] = [
        one._ParseMatchStmtImpl,
        one._ParseCaseStmtImpl,
        lambda: one._TokNode(0),
        lambda: one._ParseExceptionAt(0),
        lambda: one._NodeForPattern(1, 2),
        lambda: one._NodeForNumberPattern(1, 2),
        lambda: one._NonNestedFindTokenIndex("x", 0, 1),
    ]
    for step in steps:
        with pytest.raises(TypeError, match="'NoneType' object is not subscriptable"):
            step()
    assert one._NonNestedFindTokenIndex("x", 1, 1) == -1
    one._fToks = ("case", "x", ":")
    assert one._NonNestedFindTokenIndex("x", 0, 3) == 1
    with pytest.raises(TypeError):
        one._TokNode(0)


def test_tokens_are_kept_as_they_are() -> None:
    toks = ("a", "# b", "c")
    places = ((0, 0), (0, 1), (1, 0))
    one = match_parser()
    one._fToks, one._fPositions = toks, places
    assert one._fToks is toks
    assert one._fPositions is places
    assert (one._TokNode(2).fText, one._TokNode(2).fContext) == ("c", (1, 0))
    with pytest.raises(TypeError, match="Expected tuple, got list"):
        one._fToks = ["a"]
    with pytest.raises(TypeError, match="Expected tuple, got list"):
        one._fPositions = [(0, 0)]
    with pytest.raises(TypeError, match="Expected str, got NoneType"):
        one._fToks = ("a", None)
    assert one._fToks is toks


def test_a_statement_takes_tuples_only() -> None:
    line = line_of("match x:")
    toks, places = line.fToks, line.fPositions
    one = match_parser()
    for args in ((list(toks), places), (toks, list(places)), (toks, None)):
        with pytest.raises(TypeError, match="Expected tuple, got"):
            one.ParseMatchStmt(*args)
        with pytest.raises(TypeError, match="Expected tuple, got"):
            one.ParseCaseStmt(*args)
    # Where something is dropped, what is left are tuples.
    node = one.ParseMatchStmt([*toks, "# c"], [*places, (0, 9)])
    assert shape(node) == ("CMatchStmt", "match", "x", ":")


def test_nothing_dropped_needs_no_positions() -> None:
    one = match_parser()
    toks, places = ("a", "b"), ((0, 0),)
    assert one._RemoveSkipToks(toks, places)[0] is toks
    assert one._RemoveSkipToks(toks, places)[1] is places
    with pytest.raises(IndexError):
        one._RemoveSkipToks(("# a", "b"), places)
    # Equal texts are told apart by their places, and a first character is all that counts.
    assert one._RemoveSkipToks(("a", "#a", "a", "\\x", "a"), ((0, 0), (0, 1), (0, 2), (0, 3), (1, 0))) == (
        ("a", "a", "a"),
        ((0, 0), (0, 2), (1, 0)),
    )


def test_a_search_reads_no_further_than_it_needs() -> None:
    one = with_tokens("match x:")
    assert one._NonNestedFindTokenIndex("match", 0, 100) == 0
    assert one._NonNestedFindTokenIndex("match", 0, 2**62) == 0
    with pytest.raises(IndexError):
        one._NonNestedFindTokenIndex("y", 0, 100)


def test_far_indices_are_index_errors() -> None:
    one = with_tokens("case [x, {1: y}, z(1), -1] | a.b:")
    far = 2**63 - 1
    for step in (
        one._NodeForPattern,
        one._NodeForSequencePattern,
        one._NodeForMappingPattern,
        one._NodeForClassPattern,
        one._NodeForDottedNameValue,
        one._NodeForNumberPattern,
    ):
        for start, end in ((-far - 1, far), (far, -far - 1), (far, far), (-far - 1, -far - 1), (-far, 3)):
            with pytest.raises(IndexError):
                step(start, end)


def test_an_error_of_a_truth_value_is_the_hosts() -> None:
    class Odd:
        def __bool__(self) -> bool:
            raise KeyError("odd")

    with pytest.raises(KeyError, match="odd"):
        with_tokens("case x:")._NodeForPattern(1, 2, Odd())


def test_an_index_may_replace_the_tokens() -> None:
    one = with_tokens("case a as b:")

    class Replacing:
        def __index__(self) -> int:
            other = line_of("case " + "c" * 40 + " as d:")
            one._fToks, one._fPositions = other.fToks, other.fPositions
            return 1

    assert shape(one._NodeForPattern(Replacing(), 4)) == (
        "CPatternNode",
        "c" * 40,
        "as",
        "d",
    )


def test_a_statement_inside_of_another_is_refused() -> None:
    line = line_of("match " + "y" * 40 + ":")
    refused: list[str] = []

    class Nested(CPGenParserImpl):
        def convert(self, number: int, value: str | None, context: object, children: list[CNode] | None) -> CNode:
            own = self._fMatchCaseStatementParser

            def set_tokens() -> None:
                own._fToks = line.fToks

            attempts: list[Callable[[], object]] = [
                lambda: own.ParseMatchStmt(line.fToks, line.fPositions),
                lambda: self.ParseToNode(line, False),
                set_tokens,
            ]
            for attempt in attempts:
                try:
                    attempt()
                except RuntimeError as error:
                    refused.append(str(error))
            return super().convert(number, value, context, children)

    mine = Nested((3, 12))
    node = mine.ParseToNode(line_of("match x:"), False)
    assert shape(node) == ("CMatchStmt", "match", "x", ":")
    assert set(refused) == {"a match or case statement is being parsed"}
    assert len(refused) % 3 == 0


def test_tokens_that_refer_back_are_collected() -> None:
    class Token(str):
        owner: object

    word = Token("case")
    one = match_parser()
    word.owner = one
    one._fToks = (word,)
    ref = weakref.ref(word)
    del word, one
    gc.collect()
    assert ref() is None
