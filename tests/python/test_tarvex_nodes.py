"""Nodes, their records and their factory: the fields, the recycling, and what a host may do to them."""

from __future__ import annotations

import gc
import re
import sys
from pathlib import Path
from typing import ClassVar

import pytest

from lines import expression, line_of, parse, parser, shape
from quillet import tarvex
from quillet.tarvex import (
    CArgInfo,
    CAsName,
    CAtom,
    CExpression,
    CExprStmt,
    CKeywordLiteral,
    CNameLiteral,
    CNode,
    CNodeClassInfo,
    CNodeFactory,
    CStmt,
    CStringLiteral,
    FinishedWithNode,
    NotCompiledFinishedWithNode,
)

OPERATORS = {"+": 14, "=": 22, ",": 12}


class Symbols:
    number2symbol: ClassVar[dict[int, str]] = {256: "file_input", 257: "simple_stmt", 258: "expr"}


def factory(keywords: object = None, classes: list[type] | None = None) -> CNodeFactory:
    classes = [CNode] * 259 if classes is None else classes
    if len(classes) > 3:
        classes[1] = CNameLiteral
        classes[3] = CStringLiteral
        classes[258] = CExpression
    return CNodeFactory(Symbols, classes, keywords, {1: "NAME", 4: "NEWLINE", 14: "PLUS"}, OPERATORS)


def leaf(text: str | None = "x", context: object = None) -> CNode:
    node = CNode()
    node.fText = text
    node.fContext = context
    return node


def tree(*children: CNode | None) -> CNode:
    node = CNode()
    node.fChildren = list(children)
    return node


# ---- the class tree ----


def test_the_class_tree() -> None:
    assert issubclass(CStmt, CNode)
    assert issubclass(CExprStmt, CStmt)
    assert issubclass(CKeywordLiteral, CExpression)
    assert issubclass(CNameLiteral, CExpression)
    for name in ("CImportNamesStmt", "CFromImportStmt", "CWithItem", "CExceptClause"):
        assert not issubclass(getattr(tarvex, name), CStmt)
    for name in ("CYieldArg", "CCompForNode", "CListmakerNode", "CTrailer"):
        assert not issubclass(getattr(tarvex, name), CExpression)
    classes = [value for value in vars(tarvex).values() if isinstance(value, type) and issubclass(value, CNode)]
    assert classes[0] is CNode
    rows = (Path(__file__).parents[2] / "core/tree/node_kinds.def").read_text()
    declared = re.findall(r"^QUILLET_NODE(?:_BASE)?\((\w+), (\w+)", rows, re.MULTILINE)
    assert [(cls.__name__, cls.__base__.__name__) for cls in classes[1:]] == declared[1:]


def test_the_rules_of_a_class() -> None:
    assert CNode.kSupportedRules == []
    assert CExpression.kSupportedRules == []
    assert tarvex.CStarExpression.kSupportedRules == ["star_expr: '*' expr"]
    assert len(tarvex.COperatorExpression.kSupportedRules) == 10
    assert tarvex.CPassStmt.kSupportedRules == []


def test_a_rule_that_matched_one_child_is_no_node() -> None:
    assert type(expression("x")) is CNameLiteral
    assert type(expression("a or b")).__name__ == "COperatorExpression"
    assert type(expression("pass")) is CKeywordLiteral
    assert type(expression("x ** 2")).__name__ == "CPower"
    assert type(expression("x.y")).__name__ == "CAtomExpr"
    assert type(expression("x.y", (2, 7))).__name__ == "CPower"


# ---- fields and children ----


def test_a_new_node_is_empty() -> None:
    node = CNode()
    assert (node.fText, node.fChildren, node.fContext, node.fClsInfo, node.fNextFree) == (None,) * 5
    assert node.GetChildCount() == node._GetChildCount() == 0
    assert node.GetStateName() == "CNode"
    assert repr(node) == "<class 'quillet.tarvex.CNode'>: CNode"
    assert CAtom().GetStateName() == "CAtom"


def test_a_leaf_has_no_children() -> None:
    node = expression("x")
    assert node.GetChildCount() == 0
    assert node.GetChildText(0) is None
    assert node.GetChild(0) is None
    assert node._DoesChildTextMatch("x") is False
    assert node.GetStateName() == "NAME"
    assert expression("pass").GetStateName() == "KEYWORD"


@pytest.mark.parametrize("index", [2, 3, 1000])
def test_past_the_end_is_none(index: int) -> None:
    node = tree(leaf("a"), leaf("b"))
    assert node.GetChild(index) is None
    assert node.GetChildText(index) is None
    assert node._GetChildText(index) is None


def test_a_negative_index_counts_from_the_end() -> None:
    node = tree(leaf("a"), leaf("b"))
    assert node.GetChild(-1).fText == "b"
    assert node.GetChildText(-2) == "a"
    for get in (node.GetChild, node.GetChildText, node._GetChildText):
        with pytest.raises(IndexError):
            get(-3)
    empty = tree()
    assert empty.fChildren == []
    with pytest.raises(IndexError):
        empty.GetChild(-1)


def test_the_text_of_an_interior_child_is_none() -> None:
    node = tree(tree(leaf("a")), leaf("b"))
    assert node.GetChildText(0) is None
    assert node._DoesChildTextMatch("a") is False
    assert node._DoesChildTextMatch("b") is True
    with pytest.raises(AttributeError, match="fText"):
        tree(None).GetChildText(0)


def test_children_are_one_object_each() -> None:
    node = expression("x = y")
    assert node.GetChild(0) is node.GetChild(0)
    assert node.fChildren is node.fChildren
    assert node.fChildren[2] is node.GetChild(2)
    assert node.GetChild(0) is not node.GetChild(2)


def test_fields_are_assignable_within_their_type() -> None:
    node = CNode()
    node.fText = "née"
    assert node.fText == "née"
    for bad, text in ((b"x", "Expected str, got bytes"), (1, "Expected str, got int")):
        with pytest.raises(TypeError, match=text):
            node.fText = bad
    for bad, text in (((), "Expected list, got tuple"), ([1], "Expected CNode, got int")):
        with pytest.raises(TypeError, match=text):
            node.fChildren = bad
    assert node.fText == "née"
    assert node.fChildren is None
    for name in ("fClsInfo", "fNextFree"):
        with pytest.raises(AttributeError):
            setattr(node, name, None)


@pytest.mark.parametrize(
    "context", [None, 0, 7, -1, (1, 2), (3, -1), (1, 2, 3), "text", 1 << 40, (1 << 40, 0), object(), [1]]
)
def test_a_context_is_any_value(context: object) -> None:
    node = CNode()
    node.fContext = context
    assert node.fContext == context
    assert type(node.fContext) is type(context)


def test_a_context_of_the_host_is_let_go_with_its_node() -> None:
    class Context:
        pass

    context = Context()
    count = sys.getrefcount(context)
    nodes = factory()
    node = nodes.ConvertSingleNode(1, "x", context, None)
    assert node.fContext is context
    nodes.DiscardNodes(node)
    del node
    assert sys.getrefcount(context) == count
    node = leaf("x", context)
    node.fContext = None
    assert sys.getrefcount(context) == count


def test_a_list_of_children_is_kept_and_read_again() -> None:
    a, b, c = leaf("a"), leaf("b"), leaf("c")
    given: list[CNode | None] = [a, b]
    node = CNode()
    node.fChildren = given
    assert node.fChildren is given
    given.append(c)
    assert node.GetChildCount() == 3
    assert node.GetChild(-1) is c
    assert given.pop(0) is a
    assert node.GetChildText(0) == "b"
    given[0] = None
    assert node.GetChild(0) is None
    given.append(1)
    assert node.GetChildCount() == 3
    assert node.GetChild(1) is c
    for read in (node.GetChild, node.GetChildText):
        with pytest.raises(TypeError, match="Expected CNode, got int"):
            read(2)
    with pytest.raises(TypeError, match="Expected CNode, got int"):
        tarvex.FinishedWithNode(node)
    with pytest.raises(IndexError):
        node.GetChild(-4)
    given.pop()
    node.fChildren = None
    assert node.fChildren is None
    assert node.GetChildCount() == 0


def test_what_a_host_changes_in_a_list_reaches_operations_on_the_tree() -> None:
    node = expression("f(a)")
    node.GetChild(1).fChildren.pop(1)
    assert shape(node) == ("CAtomExpr", "f", ("CTrailer", "(", ")"))
    assert tarvex.CNodeToTextConverterImpl(include_arg_text=True).TextForNode(node) == b"f()"


def test_a_list_whose_node_was_discarded_is_let_go() -> None:
    node = parse("x = y")
    children = node.fChildren
    parser().DiscardNode(node)
    assert node.fChildren is None
    assert len(children) == 3
    children.clear()
    assert node.GetChildCount() == 0


def test_children_of_another_tree_live_as_long_as_they_are_seen() -> None:
    def build() -> CNode:
        node = CStmt()
        one = tarvex.CPGenParserImpl((3, 8))
        node.fChildren = [one.ParseToNode(line_of("some_name"), False), leaf("other")]
        return node

    node = build()
    gc.collect()
    assert node.GetChildText(0) == "some_name"
    outer = tree(node)
    del node
    gc.collect()
    assert outer.GetChild(0).GetChild(0).fText == "some_name"


def test_a_wrapper_outlives_its_parser_and_its_line() -> None:
    node = tarvex.CPGenParserImpl((3, 8)).ParseToNode(line_of("alpha = beta"), False)
    child = node.GetChild(2)
    del node
    gc.collect()
    assert child.fText == "beta"


def test_a_stale_wrapper_never_shows_freed_memory() -> None:
    one = tarvex.CPGenParserImpl((3, 8))
    analyzer = tarvex.CPGenAnalyzerImpl((3, 8))
    stale = []
    for i in range(400):
        text = f"name_{i} = (value_{i}, [{i}, 'text {i}'])"
        node = one.ParseToNode(line_of(text), False)
        stale.append(node.GetChild(0))
        one.DiscardNode(node)
        kept = analyzer.ParseToNode(line_of(text), False)
        stale.append(kept)
        if i % 2:
            FinishedWithNode(kept)
        analyzer.AnalyzeSingleLogical(line_of(f"({i}, = "), False)
    gc.collect()
    for node in stale:
        shape(node)
        repr(node)


def test_a_subclass_of_the_host_is_a_node() -> None:
    class Mine(CAtom):
        def extra(self) -> int:
            return self.GetChildCount()

    node = Mine()
    node.fChildren = [leaf("("), leaf(")")]
    assert node.extra() == 2
    assert node.GetInitialBracket() == "("
    assert node.GetStateName() == "Mine"
    info = CNodeClassInfo(Mine, 7, "mine")
    assert info.fCls is Mine
    made = factory().NewNode(info, 7, "t", None, None)
    assert type(made) is Mine
    assert made.GetStateName() == "mine"


# ---- records ----


def test_a_record() -> None:
    info = CNodeClassInfo(CAtom, 300, "atom")
    assert (info.fCls, info.fNodeType, info.fName, info.fFirstFree) == (CAtom, 300, "atom", None)
    assert CNodeClassInfo(CNode, 1, None).fName is None
    node = CAtom(info)
    assert node.fClsInfo is info
    assert node.GetStateName() == "atom"
    with pytest.raises(TypeError, match="Expected CNodeClassInfo, got str"):
        CAtom("atom")


@pytest.mark.parametrize(
    ("args", "error", "text"),
    [
        ((CNode, 1 << 31, None), OverflowError, "value too large to convert to int"),
        ((CNode, -(1 << 31) - 1, None), OverflowError, "value too large to convert to int"),
        ((CNode, "1", None), TypeError, "an integer is required"),
        ((CNode, 1.5, None), TypeError, "an integer is required"),
        ((CNode, 1, b"name"), TypeError, "Expected str, got bytes"),
        ((int, 1, None), TypeError, "Expected a class derived from CNode, got type"),
        ((CNode, 1), TypeError, "incompatible function arguments"),
    ],
)
def test_what_a_record_is_made_of(args: tuple[object, ...], error: type[Exception], text: str) -> None:
    with pytest.raises(error, match=text):
        CNodeClassInfo(*args)


# ---- the factory ----


def test_records_of_a_factory() -> None:
    nodes = factory({"if": None})
    infos = nodes._fClassInfoList
    assert [infos[i].fName for i in (0, 1, 4, 14, 256, 258)] == [None, "NAME", "NEWLINE", "PLUS", "file_input", "expr"]
    assert [infos[i].fNodeType for i in range(259)] == list(range(259))
    keyword = nodes._fKeywordClassInfo
    assert (keyword.fCls, keyword.fNodeType, keyword.fName) == (CKeywordLiteral, 1, "KEYWORD")
    assert nodes._fOperatorStrToNumber == OPERATORS
    assert nodes._fOperatorStrToNumber is not OPERATORS
    assert factory()._fKeywordClassInfo is None
    assert factory({})._fKeywords == {}


def test_keywords_are_a_dict_that_is_kept() -> None:
    keywords: dict[str, None] = {"if": None}
    nodes = factory(keywords)
    assert nodes._fKeywords is keywords
    assert type(nodes.ConvertSingleNode(1, "if", 0, None)) is CKeywordLiteral
    assert type(nodes.ConvertSingleNode(1, "elif", 0, None)) is CNameLiteral
    keywords["elif"] = None
    assert type(nodes.ConvertSingleNode(1, "elif", 0, None)) is CKeywordLiteral
    with pytest.raises(TypeError, match="Expected dict, got list"):
        factory(["if"])


def test_without_keywords_every_name_is_a_name() -> None:
    nodes = factory()
    assert type(nodes.ConvertSingleNode(1, "if", 0, None)) is CNameLiteral
    for number in (55, 56):
        with pytest.raises(AttributeError, match="fFirstFree"):
            nodes.ConvertSingleNode(number, "await", 0, None)
    with pytest.raises(AttributeError, match="fFirstFree"):
        nodes.NewKeywordNode("if", 0)


@pytest.mark.parametrize("number", [55, 56])
def test_async_and_await_are_keyword_leaves_whatever_their_text(number: int) -> None:
    assert type(factory({"x": None}).ConvertSingleNode(number, "anything", 0, None)) is CKeywordLiteral


def test_operators() -> None:
    nodes = factory()
    node = nodes.CreateOperatorNode("+", (1, 2))
    assert (node.fText, node.fContext, node.GetStateName()) == ("+", (1, 2), "PLUS")
    assert nodes.CreateOperatorNode("@@", 0) is None
    assert nodes.CreateOperatorNode("", 0) is None
    assert nodes.NewNameNode("x", 3).GetStateName() == "NAME"


@pytest.mark.parametrize("children", [[], [None], [leaf("x")]])
def test_a_rule_has_two_children_or_more(children: list[CNode]) -> None:
    with pytest.raises(AssertionError):
        factory().ConvertSingleNode(258, None, None, children)


def test_bad_arguments_of_a_conversion() -> None:
    nodes = factory()
    with pytest.raises(IndexError):
        nodes.ConvertSingleNode(259, "x", None, None)
    with pytest.raises(AssertionError):
        nodes.ConvertSingleNode(1, b"x", None, None)
    with pytest.raises(TypeError, match="Expected list, got tuple"):
        nodes.ConvertSingleNode(258, None, None, (leaf(), leaf()))
    with pytest.raises(AttributeError, match="fClsInfo"):
        nodes.ConvertSingleNode(258, None, None, [leaf(), None])
    with pytest.raises(AttributeError, match="fFirstFree"):
        nodes.NewNode(None, 1, "x", None, None)


def test_a_statement_stands_for_itself_and_its_line_end() -> None:
    nodes = factory()
    statement = nodes.NewNameNode("x", 0)
    end = nodes.ConvertSingleNode(4, "\n", 1, None)
    children = [statement, end]
    assert nodes.ConvertSingleNode(257, None, None, children) is statement
    assert children == [statement]
    assert nodes._fClassInfoList[4].fFirstFree is end
    assert end.fText is None
    three = [nodes.NewNameNode("a", 0), nodes.NewNameNode("b", 1), nodes.ConvertSingleNode(4, "\n", 2, None)]
    node = nodes.ConvertSingleNode(257, None, None, three)
    assert node.fChildren is three
    assert node.GetStateName() == "simple_stmt"
    with_bare = nodes.ConvertSingleNode(257, None, None, [nodes.NewNameNode("a", 0), leaf("\n")])
    assert with_bare.GetChildCount() == 2


def test_a_discarded_node_is_handed_out_again() -> None:
    nodes = factory()
    node = nodes.ConvertSingleNode(258, None, "c", [nodes.NewNameNode("a", 0), nodes.NewNameNode("b", 1)])
    nodes.DiscardNodes(node)
    assert (node.fText, node.fContext, node.fChildren) == (None, None, None)
    children = [leaf("new"), leaf("er")]
    again = nodes.NewNode(nodes._fClassInfoList[258], 258, "text", 5, children)
    assert again is node
    assert (again.fText, again.fContext, again.fChildren) == ("text", 5, children)
    assert again.fChildren is children


def test_free_lists_are_last_in_first_out() -> None:
    nodes = factory()
    info = nodes._fClassInfoList[258]
    child = nodes.NewNode(info, 258, None, None, None)
    parent = nodes.NewNode(info, 258, None, None, [child, leaf()])
    nodes.DiscardNodes(parent)
    assert info.fFirstFree is child
    assert child.fNextFree is parent
    assert nodes.NewNode(info, 258, "1", None, None) is child
    assert nodes.NewNode(info, 258, "2", None, None) is parent
    assert info.fFirstFree is None


@pytest.mark.parametrize(
    "finish",
    [FinishedWithNode, NotCompiledFinishedWithNode, lambda node: tarvex.__dict__["__FinishedWithNode"](node, 0)],
)
def test_all_ways_to_give_a_tree_back(finish: object) -> None:
    node = tree(leaf("a"), leaf("b"))
    assert finish(node) is None
    assert node.fChildren is None


def test_an_absent_child_ends_a_discard_half_way() -> None:
    nodes = factory()
    first = nodes.NewNameNode("a", 0)
    node = nodes.NewNode(nodes._fClassInfoList[258], 258, None, 7, [first, None, nodes.NewNameNode("b", 1)])
    with pytest.raises(AttributeError, match="fClsInfo"):
        nodes.DiscardNodes(node)
    assert first.fText is None
    assert node.fContext == 7
    assert nodes._fClassInfoList[258].fFirstFree is node
    with pytest.raises(TypeError, match="Expected CNode, got int"):
        FinishedWithNode(1)


def test_a_deep_tree_is_given_back_down_to_a_depth(capsys: pytest.CaptureFixture[str]) -> None:
    nodes = factory()
    innermost = node = nodes.NewNameNode("innermost", 1)
    chain = [node]
    for _ in range(101):
        node = nodes.NewNode(nodes._fClassInfoList[258], 258, None, None, [node])
        chain.append(node)
    nodes.DiscardNodes(node)
    assert capsys.readouterr().out == "depth too great\n"
    assert (innermost.fText, innermost.fContext) == ("innermost", 1)
    assert chain[1].fChildren is None


def test_a_raw_tree_is_converted_in_post_order() -> None:
    nodes = factory({"if": None})
    raw = (
        258,
        None,
        None,
        [(1, "a", 0, None), (258, None, None, [(1, "if", 1, None), (3, "'s'", 2, None)]), (1, "c", 3, None)],
    )
    node = nodes.RecursiveConvert(raw)
    assert shape(node) == ("CExpression", "a", ("CExpression", "if", "'s'"), "c")
    assert [type(child) for child in node.fChildren] == [CNameLiteral, CExpression, CNameLiteral]
    assert type(node.GetChild(1).GetChild(0)) is CKeywordLiteral
    line = (257, None, None, [(1, "x", 0, None), (4, "\n", 1, None)])
    assert nodes.RecursiveConvert(line).fText == "x"


@pytest.mark.parametrize(
    ("raw", "error"),
    [
        (None, TypeError),
        ([1, "x", 0, None], TypeError),
        ((1, "x", 0), ValueError),
        ((1, "x", 0, None, None), ValueError),
        (("1", "x", 0, None), TypeError),
        ((1 << 31, "x", 0, None), OverflowError),
        ((258, None, 0, ()), TypeError),
        ((258, None, 0, [None, None]), TypeError),
        ((259, "x", 0, None), IndexError),
        ((258, None, 0, [(1, "x", 0, None)]), AssertionError),
    ],
)
def test_raw_nodes_of_the_wrong_shape(raw: object, error: type[Exception]) -> None:
    with pytest.raises(error):
        factory().RecursiveConvert(raw)


def test_a_raw_tree_too_deep_is_a_recursion_error() -> None:
    raw: tuple[object, ...] = (1, "x", 0, None)
    for _ in range(100_000):
        raw = (258, None, None, [raw, (1, "y", 1, None)])
    with pytest.raises(RecursionError):
        factory().RecursiveConvert(raw)


# ---- argument records ----


def test_argument_records_take_nodes() -> None:
    arg = CArgInfo()
    assert (arg.name, arg.value, arg.prefix, arg.type_expr) == (None,) * 4
    node = leaf("x")
    arg.name = arg.value = arg.type_expr = node
    arg.prefix = "**"
    assert arg.name is node
    assert arg.prefix == "**"
    for field in ("name", "value", "type_expr"):
        with pytest.raises(TypeError, match="Expected CNode, got str"):
            setattr(arg, field, "x")
    with pytest.raises(TypeError, match="Expected str, got int"):
        arg.prefix = 1
    name = CAsName()
    assert (name.module_name, name.as_name) == (None, None)
    name.module_name = "a.b"
    assert name.module_name == "a.b"


def test_host_made_nodes_do_not_pile_up() -> None:
    import tracemalloc

    def make() -> None:
        for _ in range(2000):
            node = CAtom()
            node.fText = "text"
            node.fContext = object()

    make()
    gc.collect()
    tracemalloc.start()
    try:
        make()
        gc.collect()
        assert tracemalloc.get_traced_memory()[0] < 10_000
    finally:
        tracemalloc.stop()
