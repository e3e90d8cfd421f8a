"""Construction of a parser, and the feeding of fragments that a grammar of whole files does not have."""

from __future__ import annotations

import gc
import weakref
from pathlib import Path

import pytest

from lines import PY2_KEYWORDS, line_of, parse, parser, shape
from quillet import _fastaccess, config, optpgen
from quillet.logicalline import CLogicalLine
from quillet.optpgen import ParseError
from quillet.tarvex import (
    CAtom,
    CExpression,
    CIfStmt,
    CMatchCaseStatementParser,
    CNameLiteral,
    CNode,
    CNodeFactory,
    CPGenAnalyzer,
    CPGenAnalyzerImpl,
    CPGenParserImpl,
    CSingleDecorator,
    NextNonRemovedTokenInTuple,
    kPy2DefaultGrammar,
    kPy3DefaultGrammar,
)

GRAMMAR = Path(config.GetNorvaFilename(f"resources/pgen-grammars/{kPy3DefaultGrammar}"))


# ---- construction ----


def test_an_absolute_grammar_file_is_taken_as_it_stands(tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    copy = tmp_path / "grammar"
    copy.write_bytes(GRAMMAR.read_bytes())

    def lookup(name: str) -> str:
        raise AssertionError("looked up")

    monkeypatch.setattr(config, "GetNorvaFilename", lookup)
    assert CPGenParserImpl((3, 8), str(copy)).ParseTokenListToNode(["x"], False).fText == "x"
    with pytest.raises(AssertionError, match="looked up"):
        CPGenParserImpl((3, 8))


@pytest.mark.parametrize(
    ("version", "always"),
    [((3, 6, 9), False), ((3, 7, 0), True), ((3, 7), True), ((3, 8, 1), True), ((2, 7), False), ((3,), False)],
)
def test_async_is_a_keyword_from_3_7_on(version: tuple[int, ...], always: bool) -> None:
    one = CPGenParserImpl(version)
    assert one._fAsyncAlwaysKeyword is always
    assert one._fVersionTriple is version


def test_what_a_parser_shows() -> None:
    one = parser()
    assert isinstance(one, CPGenAnalyzer)
    assert isinstance(one, optpgen.NodeConverter)
    assert one._fGrammar.symbol2number["file_input"] == one._fFileInputNumber
    assert one._fGrammar.number2symbol[one._fFileInputNumber] == "file_input"
    assert one._fPy3Grammar is True
    assert "lambda" in one._fKeywords
    assert set(one._fKeywords.values()) == {None}
    assert isinstance(one._fParser, optpgen.Parser)
    assert isinstance(one._fNodeFactory, CNodeFactory)
    assert isinstance(one._fMatchCaseStatementParser, CMatchCaseStatementParser)
    assert one._fMatchCaseStatementParser is one._fMatchCaseStatementParser
    assert one._fMatchCaseStatementParser._fPGenParser is one
    with pytest.raises(NotImplementedError):
        one.AnalyzeSingleLogical(line_of("x"), False)


def test_each_state_has_a_class() -> None:
    one = parser()
    classes = one._fClsForStateList
    assert classes == one._BuildClsForStateList()
    assert len(classes) == max(one._fGrammar.number2symbol) + 1
    assert classes[1] is CNameLiteral
    number = one._fGrammar.symbol2number
    assert classes[number["atom"]] is CAtom
    assert classes[number["if_stmt"]] is CIfStmt
    assert classes[number["suite"]] is CNode
    assert classes[number["comp_op"]] is CNode
    assert classes[4] is CNode
    assert CPGenParserImpl.kClsForState["decorator"] is CSingleDecorator
    assert CPGenParserImpl.kClsForState["NAME"] is CNameLiteral


def test_the_class_of_a_state_is_read_at_construction(monkeypatch: pytest.MonkeyPatch) -> None:
    monkeypatch.setitem(CPGenParserImpl.kClsForState, "suite", CAtom)
    monkeypatch.setitem(CPGenParserImpl.kClsForState, "comp_op", None)
    mine = CPGenParserImpl((3, 8))
    numbers = mine._fGrammar.symbol2number
    assert mine._fClsForStateList[numbers["suite"]] is CAtom
    assert mine._fClsForStateList[numbers["comp_op"]] is CExpression
    assert CPGenAnalyzerImpl((3, 8))._fLogicalParser._fClsForStateList == mine._fClsForStateList


def test_tokens_that_the_sibling_declares_may_stand_in_a_grammar(
    tmp_path: Path, monkeypatch: pytest.MonkeyPatch
) -> None:
    path = tmp_path / "grammar"
    path.write_text("file_input: (NAME | FOO) ENDMARKER\n")
    with pytest.raises(ValueError, match="FOO"):
        CPGenParserImpl((3, 8), str(path))
    monkeypatch.setattr(_fastaccess, "kTokenId_FOO", 150, raising=False)
    mine = CPGenParserImpl((3, 8), str(path))
    assert 150 in {label[0] for label in mine._fGrammar.labels}


@pytest.mark.parametrize(("version", "keywords"), [([3, 8], None), ((3, 8), 5)])
def test_a_bad_grammar_file_is_told_before_a_bad_version_or_keyword(version: object, keywords: object) -> None:
    with pytest.raises(OSError, match="nonexistent"):
        CPGenParserImpl(version, "/nonexistent", keywords)
    with pytest.raises(TypeError):
        CPGenParserImpl(version, keyword_seq=keywords)


def test_keywords_are_text_or_bytes() -> None:
    one = CPGenParserImpl((3, 8), keyword_seq=["if", b"else", "mine"])
    assert one._fKeywords == {"if": None, "else": None, "mine": None}
    assert type(one.ParseTokenListToNode(["mine"], False)).__name__ == "CKeywordLiteral"
    assert type(one.ParseTokenListToNode(["lambda_"], False)).__name__ == "CNameLiteral"
    with pytest.raises(TypeError, match="Expected str, got int"):
        CPGenParserImpl((3, 8), keyword_seq=[1])


def test_a_bad_grammar_is_an_error_that_says_where(tmp_path: Path) -> None:
    bad = tmp_path / "bad"
    bad.write_text("file_input: NAME missing\n")
    with pytest.raises(ValueError, match=r"bad.*missing"):
        CPGenParserImpl((3, 8), str(bad))
    lone = tmp_path / "lone"
    lone.write_text("start: NAME ENDMARKER\n")
    with pytest.raises(KeyError, match="file_input"):
        CPGenParserImpl((3, 8), str(lone))


def test_a_parser_and_what_it_made_are_collected_together() -> None:
    class Mine(CPGenParserImpl):
        def convert(self, number: int, value: str | None, context: object, children: list[CNode] | None) -> CNode:
            return super().convert(number, value, context, children)

    one = Mine((3, 8))
    one.DiscardNode(one.ParseToNode(line_of("x = 1"), False))
    one._fParser  # noqa: B018  (made when read)
    one._fMatchCaseStatementParser  # noqa: B018
    gone = weakref.ref(one)
    del one
    gc.collect()
    assert gone() is None


# ---- feeding ----


def leaves(node: CNode) -> list[str | None]:
    if node.fChildren is None:
        return [node.fText]
    return [text for child in node.fChildren for text in leaves(child)]


@pytest.mark.parametrize(
    ("text", "state", "first"),
    [
        ("elif x:", "if_stmt", "if"),
        ("else:", "if_stmt", "if"),
        ("except ValueError as e:", "try_stmt", "try"),
        ("except:", "try_stmt", "try"),
        ("finally:", "try_stmt", "try"),
        ("try:", "try_stmt", "try"),
        ("try: x = 1", "try_stmt", "try"),
        ("while x:", "while_stmt", "while"),
        ("class C:", "classdef", "class"),
        ("class C: pass", "classdef", "class"),
        ("@decorator(1)", "decorator", "@"),
        ("@a.b", "decorator", "@"),
        ("def f(): return 1", "funcdef", "def"),
    ],
)
def test_fragments_parse(text: str, state: str, first: str) -> None:
    node = parser().ParseTokenListToNode([tok for line in cut(text) for tok in line], False)
    assert node is not None
    assert node.GetStateName() == state
    assert leaves(node)[0] == first


def cut(text: str) -> list[tuple[str, ...]]:
    from quillet.logicalline import GetLogicalsFromText

    return [line.fToks for line in GetLogicalsFromText(text)]


def test_a_head_gets_the_body_pass_and_a_whole_statement_none() -> None:
    assert leaves(parse("class C:"))[-1] == "pass"
    whole = parser().ParseTokenListToNode(["class", "C", ":", "x"], False)
    assert [leaf for leaf in leaves(whole) if leaf and leaf.strip()] == ["class", "C", ":", "x"]
    with pytest.raises(ParseError):
        parser().ParseTokenListToNode(["x", "=", "a", "[", "1", ":"], False)


def test_a_lone_try_gets_an_empty_finally() -> None:
    words = [leaf for leaf in leaves(parse("try:")) if leaf and leaf.strip()]
    assert words == ["try", ":", "pass", "finally", ":", "pass"]
    one_line = parser().ParseTokenListToNode(["try", ":", "x"], False)
    assert [leaf for leaf in leaves(one_line) if leaf and leaf.strip()] == ["try", ":", "x", "finally", ":", "pass"]


@pytest.mark.parametrize(
    ("version", "in_async_def", "text", "parses"),
    [
        ((3, 6), False, "async = 1", True),
        ((3, 7), False, "async = 1", False),
        ((3, 6), True, "async = 1", False),
        ((3, 6), False, "await x", False),
        ((3, 6), True, "await x", True),
        ((3, 7), False, "await x", True),
        ((3, 6), False, "async def f():", True),
        ((3, 6), False, "async with a:", False),
        ((3, 6), True, "async with a:", True),
    ],
)
def test_async_and_await(version: tuple[int, int], in_async_def: bool, text: str, parses: bool) -> None:
    line = line_of(text, (3, 8))
    one = parser(version)
    if parses:
        node = one.ParseToNode(line, in_async_def)
        assert node is not None
        one.DiscardNode(node)
    else:
        with pytest.raises(ParseError):
            one.ParseToNode(line, in_async_def)


def test_an_ellipsis_is_three_dots_to_the_old_grammar() -> None:
    old = CPGenParserImpl((2, 7), kPy2DefaultGrammar, PY2_KEYWORDS, False)
    node = old.ParseTokenListToNode(["x", "[", "...", "]"], False)
    assert leaves(node) == ["x", "[", ".", ".", ".", "]"]
    assert leaves(parser().ParseTokenListToNode(["x", "[", "...", "]"], False)) == ["x", "[", "...", "]"]


@pytest.mark.parametrize(("positions", "parses"), [(((0, 0), (0, 2), (1, 0)), True), (((0, 0), (0, 2), (0, 4)), False)])
def test_a_backslash_is_dropped_only_in_front_of_a_later_line(
    positions: tuple[tuple[int, int], ...], parses: bool
) -> None:
    toks = ("-", "\\", "x")
    if parses:
        assert leaves(parser().ParseToksToNode(toks, False, positions)) == ["-", "x"]
    else:
        with pytest.raises(ParseError) as caught:
            parser().ParseToksToNode(toks, False, positions)
        assert caught.value.context == 1
    assert leaves(parser()._ParseToksToNodeImpl(toks, False, None)) == ["-", "x"]


@pytest.mark.parametrize(
    ("tok_i", "positions", "skips"),
    [
        (0, None, True),
        (1, ((0, 0),), False),
        (0, ((0, 0),), True),
        (0, ((0, 0), (1, 0)), True),
        (0, ((0, 0), (0, 1)), False),
    ],
)
def test_which_backslashes_are_skipped(tok_i: int, positions: object, skips: bool) -> None:
    assert parser()._ShouldSkipSlash(tok_i, positions) is skips


@pytest.mark.parametrize("toks", [(), (None, None), ("# only",), (None, "# only")])
def test_nothing_to_feed_gives_none(toks: tuple[str | None, ...]) -> None:
    positions = tuple((0, i) for i in range(len(toks)))
    assert parser().ParseToksToNode(toks, False, positions) is None
    assert parser().ParseTokenListToNode(list(toks), False) is None


@pytest.mark.parametrize(("text", "context"), [("x = = y", 2), ("x =", 2), ("f(", 2), (") x", 0), ("else x:", 1)])
def test_a_parse_error_has_the_index_of_its_token(text: str, context: int) -> None:
    with pytest.raises(ParseError) as caught:
        parse(text)
    assert caught.value.context == context


def test_removed_tokens_keep_the_indices_of_the_others() -> None:
    node = parser().ParseToksToNode((None, "x", None, "=", "y"), False, ((0, 0),) * 5)
    assert [(child.fText, child.fContext) for child in node.fChildren] == [("x", 1), ("=", 3), ("y", 4)]


@pytest.mark.parametrize("bad", [1, b"x", 1.5])
def test_tokens_are_text_or_none(bad: object) -> None:
    with pytest.raises(TypeError, match=f"Expected str, got {type(bad).__name__}"):
        parser().ParseToksToNode(("x", bad), False, ((0, 0), (0, 1)))


# ---- finding ----


@pytest.mark.parametrize(
    ("toks", "tok_i", "following", "preceding"),
    [
        (("a", "b"), -1, 0, 2),
        (("a", "b"), 0, 1, 2),
        (("a", "b"), 1, 2, 0),
        (("a", "# c", "\\", None, "", "b"), 0, 5, 6),
        (("a", "# c", "\\", None, "", "b"), 5, 6, 0),
        (("a", "b"), 99, 2, 1),
        (("a", "b"), 2**63 - 1, 2, 1),
        (("a", "b"), -(2**63), 0, 2),
        ((), -1, 0, 0),
    ],
)
def test_significant_tokens(toks: tuple[str | None, ...], tok_i: int, following: int, preceding: int) -> None:
    assert parser()._FindNextNonSkipIndex(toks, tok_i) == following
    assert parser()._FindPrevNonSkipIndex(list(toks), tok_i) == preceding


@pytest.mark.parametrize(
    ("tok", "toks", "start", "end", "index"),
    [
        (",", ("a", "(", ",", ")", ","), 0, 5, 4),
        (")", ("(", "a", ")"), 1, 3, 2),
        ("(", ("a", "(", ")"), 0, 3, 1),
        (",", ("a", ")", ","), 0, 3, -1),
        (",", ("a", ","), 2, 2, -1),
        (":", ("{", ":", "}", ":"), 0, 4, 3),
    ],
)
def test_tokens_outside_of_brackets(tok: str, toks: tuple[str, ...], start: int, end: int, index: int) -> None:
    assert parser()._NonNestedFindTokenIndex(tok, toks, start, end) == index


def test_a_removed_token_in_a_search_is_a_type_error() -> None:
    with pytest.raises(TypeError, match=r"object of type 'NoneType' has no len\(\)"):
        parser()._NonNestedFindTokenIndex(",", (None, ","), 0, 2)


def test_the_next_token_that_counts() -> None:
    assert NextNonRemovedTokenInTuple(("# c", "\\", "def"), 0) == "def"
    assert NextNonRemovedTokenInTuple(("a", "# c"), 1) is None
    with pytest.raises(TypeError, match="'NoneType' object is not subscriptable"):
        NextNonRemovedTokenInTuple((None, "a"), 0)
    with pytest.raises(IndexError, match="string index out of range"):
        NextNonRemovedTokenInTuple(("", "a"), 0)
    assert NextNonRemovedTokenInTuple(("a", "b"), -1) == "b"
    assert NextNonRemovedTokenInTuple(("a", "b"), 2**40) is None
    with pytest.raises(IndexError, match="tuple index out of range"):
        NextNonRemovedTokenInTuple(("a", "b"), -3)


def test_raising_a_parse_error_by_hand() -> None:
    with pytest.raises(ParseError) as caught:
        parser()._RaiseParseError(7)
    error = caught.value
    assert (error.msg, error.type, error.value, error.context) == ("syntax error", None, None, 7)


# ---- special cases ----


@pytest.mark.parametrize(
    ("text", "same_as"),
    [
        ("with (a):", "with a:"),
        ("with (a, b,):", "with a, b:"),
        ("with (open(a) as f, open(b) as g,):", "with open(a) as f, open(b) as g:"),
        ("except *E as e:", "except E as e:"),
    ],
)
def test_newer_statements_parse_as_older_ones(text: str, same_as: str) -> None:
    assert shape(parse(text)) == shape(parse(same_as))


@pytest.mark.parametrize("text", ["with ():", "except *:", "async with (a as b, c as d):"])
def test_what_has_no_older_form_is_rejected(text: str) -> None:
    with pytest.raises(ParseError):
        parse(text)


def test_type_parameters_wrap_the_statement() -> None:
    node = parse("def f[T, *Ts, **P](x):", (3, 12))
    assert shape(node)[:4] == (
        "CWithTypeParameters",
        ("CTypeParameter", "T"),
        ("CTypeParameter", "*", "Ts"),
        ("CTypeParameter", "**", "P"),
    )
    assert shape(node.fChildren[3])[0] == "CFuncdefStmt"
    assert node.fClsInfo is None
    bound = parse("class C[T: int]:", (3, 12))
    assert shape(bound.GetTypeParameters()[0]) == ("CTypeParameter", "T", ":", "int")
    assert type(parse("type X = int", (3, 12))).__name__ == "CExprStmt"
    assert type(parse("type X[T] = list[T]", (3, 12))).__name__ == "CWithTypeParameters"
    assert type(parse("async def f[T]():", (3, 12))).__name__ == "CWithTypeParameters"
    assert type(parse("type = 5", (3, 12))).__name__ == "CExprStmt"
    assert type(parse("type(x)", (3, 12))).__name__ == "CAtomExpr"


def test_an_open_list_of_type_parameters_fails_at_its_bracket() -> None:
    toks = ("def", "f", "[", "T", "(", "x", ")", ":", "pass")
    positions = tuple((0, i) for i in range(len(toks)))
    for parse_it in (
        lambda: parser().ParseToksToNode(toks, False, positions),
        lambda: parser().GetTypeParameterNodes(toks),
    ):
        with pytest.raises(ParseError) as caught:
            parse_it()
        assert caught.value.context == 2


def test_names_of_type_parameters_of_a_line_that_may_not_parse() -> None:
    names = lambda toks: [node.GetName().fText for node in parser().GetTypeParameterNodes(toks)]  # noqa: E731
    assert names(("def", "f", "[", "T", ",", "*", "Ts", ",", "1", "]", "(")) == ["T", "Ts"]
    assert names(("async", "def", "f", "[", "T", "]")) == ["T"]
    assert names(("x", "[", "T", "]")) == []
    assert names(()) == []
    with pytest.raises(TypeError, match="'NoneType' object is not subscriptable"):
        names(("def", "f", "[", "T", ":", "int", "]"))


@pytest.mark.parametrize("tok_i", [0, 1, 10**7, -(10**7)])
def test_a_special_case_begins_at_a_token(tok_i: int) -> None:
    with pytest.raises(IndexError, match="tuple index out of range"):
        parser()._ParseSpecialCaseWithTypeParameter([], False, [], tok_i)


@pytest.mark.parametrize("end", [3, 100, 10**7])
def test_a_bound_ends_with_the_tokens(end: int) -> None:
    toks = ["T", ":", "int"]
    node = parser()._CreateSingleTypeParameterNode(toks, False, [(0, 0)] * 3, 0, end, True)
    assert shape(node) == ("CTypeParameter", "T", ":", "int")
    bare = parser()._CreateSingleTypeParameterNode(toks[:2], False, [(0, 0)] * 2, 0, end, True)
    assert shape(bare) == ("CTypeParameter", "T")


# ---- a converter of the host's ----


def test_a_subclass_may_override_convert() -> None:
    class Counting(CPGenParserImpl):
        def __init__(self) -> None:
            self.converted: list[tuple[int, str | None]] = []
            super().__init__((3, 8))

        def convert(self, number: int, value: str | None, context: object, children: list[CNode] | None) -> CNode:
            self.converted.append((number, value))
            return super().convert(number, value, context, children)

    mine = Counting()
    node = mine.ParseToNode(line_of("x = y + 1"), False)
    assert shape(node) == shape(parse("x = y + 1"))
    assert [value for _, value in mine.converted if value and value.strip()] == ["x", "=", "y", "+", "1"]
    mine.DiscardNode(node)
    with pytest.raises(ParseError) as caught:
        mine.ParseToNode(line_of("x = = 1"), False)
    error = caught.value
    assert (error.msg, error.type, error.value, error.context) == ("bad input", 22, "=", 2)
    assert str(error) == "bad input: type=22, value='=', context=2"


def test_tokens_may_change_under_a_converter_of_the_host() -> None:
    class Changing(CPGenParserImpl):
        def convert(self, number: int, value: str | None, context: object, children: list[CNode] | None) -> CNode:
            line.fToks = ("q",)
            line.fPositions = ()
            return super().convert(number, value, context, children)

    toks = ("f", "(", *("\\", "a", ",") * 1000, ")", "#" + "x" * 200_000)
    line = CLogicalLine(toks=toks, positions=tuple((i, i) for i in range(len(toks))))
    node = Changing((3, 8)).ParseToNode(line, False)
    assert shape(node) == shape(parser().ParseToNode(line_of(f"f({'a,' * 1000})"), False))


def test_the_host_may_feed_the_engine_itself() -> None:
    mine = CPGenParserImpl((3, 8))
    mine._fParser.setup(mine._fFileInputNumber)
    mine._AddTokenList(["x", "\n"], 0)
    mine._fParser.addtoken(0, "", 1)
    assert shape(mine._fParser.finish()) == ("CNode", "x", "")


def test_an_error_in_convert_leaves_the_parse() -> None:
    class Failing(CPGenParserImpl):
        def convert(self, number: int, value: str | None, context: object, children: list[CNode] | None) -> CNode:
            if value == "y":
                raise LookupError("no y")
            return super().convert(number, value, context, children)

    mine = Failing((3, 8))
    with pytest.raises(LookupError, match="no y"):
        mine.ParseToNode(line_of("x = y"), False)
    assert shape(mine.ParseToNode(line_of("x = z"), False)) == ("CExprStmt", "x", "=", "z")


def test_every_token_type_has_its_name() -> None:
    numbers = {
        name.removeprefix("kTokenId_"): value
        for name, value in vars(_fastaccess).items()
        if name.startswith("kTokenId_")
    }
    assert numbers["NAME"] == 1
    assert numbers["AWAIT"] == 55
    assert numbers["BACKSLASH"] == 203


@pytest.mark.filterwarnings("ignore:nanobind. attempted to access an uninitialized instance:RuntimeWarning")
def test_a_parser_that_was_not_initialised_is_a_type_error() -> None:
    class Forgetful(CPGenParserImpl):
        def __init__(self) -> None:
            pass

    mine = Forgetful()
    for name in ("_fParser", "_fMatchCaseStatementParser", "_fGrammar"):
        with pytest.raises(TypeError):
            getattr(mine, name)


def test_a_line_parses_as_its_tokens() -> None:
    line = CLogicalLine(toks=("x", "=", "1"), positions=((0, 0), (0, 2), (0, 4)))
    assert shape(parser().ParseToNode(line, False)) == ("CExprStmt", "x", "=", "1")
    with pytest.raises(TypeError, match="Expected CLogicalLine, got str"):
        parser().ParseToNode("x = 1", False)
