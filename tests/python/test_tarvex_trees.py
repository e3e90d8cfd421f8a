"""Trees that a host put together: of nodes of several pools, with wrong items, closed to rings, and very wide ones."""

from __future__ import annotations

import gc
import weakref
from collections.abc import Callable

import pytest

from lines import analyzer, expression, line_of, parser
from quillet import tarvex
from quillet.logicalline import CLogicalLine
from quillet.tarvex import (
    CAtom,
    CCompForNode,
    CDefiningArglistNode,
    CFromImportStmt,
    CFunctionParameterDef,
    CImportNamesStmt,
    CNode,
    CNodeClassInfo,
    CNodeFactory,
    CNodeToTextConverterImpl,
    CPGenParserImpl,
    FinishedWithNode,
    GetDefiningArgInfoList,
    GetTokenEndIndex,
)


def factory() -> CNodeFactory:
    return parser()._fNodeFactory


def leaf(text: str) -> CNode:
    node = CNode()
    node.fText = text
    return node


def of_own_record(*children: CNode) -> CNode:
    """A node of a pool that nothing else holds."""
    node = CNode(CNodeClassInfo(CNode, 3, "own"))
    if children:
        node.fChildren = list(children)
    return node


def in_parentheses(node: CNode, cls: type[CNode] = CAtom) -> CNode:
    outer = cls()
    outer.fChildren = [leaf("("), node, leaf(")")]
    return outer


def let_unheld_lists_go() -> None:
    """Lists of children that nobody holds go a few at a time, with the operations that follow."""
    gc.collect()
    for _ in range(3000):
        CNode().fChildren  # noqa: B018


# ---- absent children ----


def imports_without_a_name() -> list[CNode]:
    names = CImportNamesStmt()
    names.fChildren = [leaf("import"), None]
    from_import = CFromImportStmt()
    from_import.fChildren = [leaf("from"), leaf("a"), leaf("import"), leaf("("), None]
    return [names, from_import]


@pytest.mark.parametrize("which", [0, 1])
def test_an_import_whose_name_is_absent_has_no_text(which: int) -> None:
    node = imports_without_a_name()[which]
    with pytest.raises(AttributeError, match="fText"):
        node.GetAsNameList()
    walker = analyzer((3, 12))._fNodeWalker
    with pytest.raises(AttributeError, match="fText"):
        walker.Walk(node, line_of("import a"))


def test_the_text_of_an_absent_name_is_an_attribute_error() -> None:
    with pytest.raises(AttributeError, match="fText"):
        tarvex._TextForImportName([None])


# ---- trees of several pools ----


def test_a_pool_lives_as_long_as_a_tree_reaches_it_through_another() -> None:
    inner = of_own_record()
    inner.fText = "inner"
    root = CNode()
    root.fChildren = [of_own_record(inner)]
    del inner
    gc.collect()
    for _ in range(50):
        of_own_record()
        GetTokenEndIndex  # noqa: B018
        root.GetStateName()
        tarvex.IsTupleLiteralNode(root)
    assert root.fChildren[0].fChildren[0].fText == "inner"


def test_texts_live_as_long_as_a_tree_of_another_pool_shows_them() -> None:
    def make() -> CNode:
        middle = CNode()
        middle.fChildren = [parser().ParseToNode(line_of("some_long_name + some_other_name", (3, 8)), False)]
        other = CPGenParserImpl((3, 12))._fNodeFactory
        return other.NewNode(other._fClassInfoList[300], 300, None, None, [middle, CNode()])

    root = make()
    gc.collect()
    tarvex.IsTupleLiteralNode(root)
    name = root.fChildren[0].fChildren[0].fChildren[0]
    del root
    gc.collect()
    [str(i) * 20 for i in range(1000)]
    assert name.fText == "some_long_name"


class Mortal:
    """A context that tells when the pool of its node is gone."""


def test_pools_that_keep_each_other_go_when_no_wrapper_is_left() -> None:
    def make() -> weakref.ref[Mortal]:
        context = Mortal()
        first, second = of_own_record(), of_own_record()
        first.fChildren = [second]
        second.fChildren = [first]
        first.fContext = context
        return weakref.ref(context)

    # Rings of pools go some time after the lists.
    contexts = [make() for _ in range(200)]
    let_unheld_lists_go()
    gc.collect()
    assert sum(context() is not None for context in contexts) < 20


def test_a_chain_of_pools_goes_with_its_root() -> None:
    context = Mortal()
    gone = weakref.ref(context)
    last = of_own_record()
    last.fContext = context
    root = of_own_record(of_own_record(of_own_record(last)))
    del context, last
    let_unheld_lists_go()
    assert gone() is not None
    assert root.fChildren[0].fChildren[0].fChildren[0].fContext is gone()
    del root
    let_unheld_lists_go()
    assert gone() is None


def test_a_node_on_a_free_list_shows_no_children_that_are_gone() -> None:
    info = CNodeClassInfo(CNode, 3, "x")

    def fill() -> None:
        node = CNode(info)
        node.fChildren = [of_own_record(), None]
        with pytest.raises(AttributeError):
            FinishedWithNode(node)  # the node is on the list, and its children are as they were

    fill()
    let_unheld_lists_go()
    gc.collect()
    assert info.fFirstFree is not None
    assert info.fFirstFree.fChildren is None


def test_a_neighbour_on_a_free_list_shows_no_text_that_is_gone() -> None:
    engine = CPGenParserImpl((3, 12))
    for _ in range(3):
        engine.DiscardNode(engine.ParseToNode(line_of("long_name_a + long_name_b + long_name_c"), False))
    engine.ParseToNode(line_of("long_name_a + long_name_b + long_name_c"), False)
    gc.collect()
    node = engine.ParseToNode(line_of("x + y"), False)
    seen = []
    for child in node.fChildren:
        neighbour: CNode | None = child
        while neighbour is not None and len(seen) < 100:
            seen.append(neighbour.fText)
            neighbour = neighbour.fNextFree
    assert seen[0] == "x"
    assert not any(text is not None and text.startswith("long") for text in seen)


# ---- lists ----


def test_a_wrong_item_in_one_list_is_nothing_to_other_trees() -> None:
    node = CNode()
    node.fChildren = []
    held = node.fChildren
    held.append(5)
    other = expression("a+b")
    assert other.GetTerm(0).fText == "a"
    assert factory().NewNameNode("x", None).fText == "x"
    assert GetTokenEndIndex(other) == 3
    assert len(other.fChildren) == 3
    assert repr(node)
    assert CNodeToTextConverterImpl(True).TextForNode(other) == b"a + b"
    outer = CNode()
    outer.fChildren = [node]
    with pytest.raises(TypeError, match="Expected CNode, got int"):
        CNodeToTextConverterImpl(True).TextForNode(outer)
    FinishedWithNode(other)
    assert held == [5]


def test_a_wrong_item_far_down_is_found_whatever_else_the_host_holds() -> None:
    lists = [expression("f(a, b, c)").fChildren for _ in range(50)]
    node = leaf("x")
    bad = CNode()
    bad.fChildren = [node]
    held = bad.fChildren
    for _ in range(200):
        outer = CNode()
        outer.fChildren = [bad, node]
        lists.append(outer.fChildren)
        bad = outer
    held.append("no node")
    with pytest.raises(TypeError, match="Expected CNode, got str"):
        FinishedWithNode(outer)
    held.pop()
    assert len(lists) == 250


def test_a_change_far_down_in_a_wide_tree_reaches_an_operation_on_the_root() -> None:
    root = CNode()
    root.fChildren = [in_parentheses(leaf(f"x{i}")) for i in range(500)]
    held = root.fChildren[250].fChildren
    held[1] = leaf("changed")
    text = CNodeToTextConverterImpl(True).TextForNode(root, discard_simple_parens=False)
    assert b"changed" in text
    assert b"x250" not in text


def test_a_list_that_grows_while_its_tree_is_walked() -> None:
    root = expression("f(" + ", ".join(f"a{i}(b{i})" for i in range(40)) + ")")
    held = root.fChildren[1].fChildren[1].fChildren
    seen: list[bytes] = []

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            seen.append(name)
            if len(seen) == 3:
                held.extend(held * 3)
                tarvex.IsTupleLiteralNode(root)
            super().AppendTypeEquiv(name, equiv)

    analyzer()._fNodeWalker.Walk(root, Line(toks=("x",), positions=((0, 0),)))
    assert b"a39" in seen
    assert len(root.fChildren[1].fChildren[1].fChildren) == 4 * 79


# ---- rings ----


def ring() -> CNode:
    node = CAtom()
    node.fChildren = [leaf("("), node, leaf(")")]
    return node


@pytest.mark.parametrize(
    "operation",
    [
        tarvex.DropSimpleParens,
        tarvex.IsTupleLiteralNode,
        tarvex.ExpandSeqLiteral,
        lambda node: node.GetSubExpr(0),
        lambda node: node.GetSubExprCount(),
        lambda node: CNodeToTextConverterImpl().TextForNode(node),
        lambda node: CNodeToTextConverterImpl(True, True, True).TextForNode(node, discard_simple_parens=False),
    ],
)
def test_an_atom_in_itself_is_a_recursion_error(operation: Callable[[CNode], object]) -> None:
    with pytest.raises(RecursionError, match="maximum recursion depth exceeded"):
        operation(ring())


def test_other_nodes_in_themselves_are_a_recursion_error() -> None:
    node = CNode()
    node.fChildren = [node, node]
    with pytest.raises(RecursionError, match="maximum recursion depth exceeded"):
        GetTokenEndIndex(node)
    with pytest.raises(RecursionError, match="maximum recursion depth exceeded"):
        tarvex._TextForImportName([node])
    clause = CCompForNode()
    clause.fChildren = [factory().NewKeywordNode("async", None), clause]
    for read in (clause.GetTargetNode, clause.GetInNode, clause.GetCompIterNode):
        with pytest.raises(RecursionError, match="maximum recursion depth exceeded"):
            read()
    parameters = CDefiningArglistNode()
    parameters.fChildren = [in_parentheses(parameters, CFunctionParameterDef)]
    with pytest.raises(RecursionError, match="maximum recursion depth exceeded"):
        GetDefiningArgInfoList(parameters)


# ---- conversion ----


def test_a_raw_list_that_is_emptied_while_it_is_converted() -> None:
    raw: list[object] = []

    class Emptying:
        def __index__(self) -> int:
            raw.clear()
            gc.collect()
            return 300

    raw.extend((Emptying(), None, object(), [(1, "a", None, None), (1, "b", None, None)]) for _ in range(3))
    with pytest.raises(AssertionError):  # one child is left
        factory().RecursiveConvert((300, None, None, raw))
    assert raw == []


@pytest.mark.parametrize(
    ("fails", "error"),
    [
        (lambda f, c: f.ConvertSingleNode(99999, "x", c, None), IndexError),
        (lambda f, c: f.ConvertSingleNode(1, 5, c, None), AssertionError),
        (lambda f, c: f.ConvertSingleNode(300, None, c, [CNode()]), AssertionError),
        (lambda f, c: f.NewNameNode(5, c), AssertionError),
        (lambda f, c: f.NewNode(None, 1, "x", c, None), AttributeError),
        (lambda f, c: f.RecursiveConvert((99999, "x", c, None)), IndexError),
        (lambda f, c: f.RecursiveConvert((300, None, None, [(1, "x", c, None), (99999, "x", c, None)])), IndexError),
        (lambda _, c: without_keywords().NewKeywordNode("x", c), AttributeError),
        (lambda _, c: without_keywords().ConvertSingleNode(55, "x", c, None), AttributeError),
    ],
)
def test_a_context_is_let_go_where_no_node_was_made(
    fails: Callable[[CNodeFactory, object], object], error: type[Exception]
) -> None:
    context = Mortal()
    gone = weakref.ref(context)
    with pytest.raises(error):
        fails(CPGenParserImpl((3, 12))._fNodeFactory, context)
    del context
    gc.collect()
    assert gone() is None


def without_keywords() -> CNodeFactory:
    class Symbols:
        number2symbol: dict[int, str] = {}  # noqa: RUF012

    return CNodeFactory(Symbols, [CNode] * 3, None, {}, {})


def test_what_a_factory_looks_at_first() -> None:
    with pytest.raises(AssertionError):
        factory().NewNode(None, 1, 5, None, None)
    with pytest.raises(IndexError):
        factory().ConvertSingleNode(10**6, 5, None, None)
    with pytest.raises(AssertionError):
        factory().ConvertSingleNode(10**6, 5, None, [CNode()])
    with pytest.raises(AssertionError):
        factory().ConvertSingleNode(55, 5, None, None)


def test_a_node_may_be_of_another_class_than_its_record() -> None:
    info = CNodeClassInfo(CAtom, 300, "atom")
    node = CNode(info)
    assert node.fClsInfo is info
    assert node.GetStateName() == "atom"
    parent = CNode()
    parent.fChildren = [node]
    del node
    shown = parent.fChildren[0]
    assert type(shown) is CNode
    FinishedWithNode(shown)
    parent.fChildren = None
    again = factory().NewNode(info, 300, None, None, [leaf("["), leaf("]")])
    assert again is shown
    assert type(factory().NewNode(info, 300, None, None, None)) is CAtom


# ---- small ----


def test_what_is_no_parameter_is_in_the_error() -> None:
    atom = expression("(a, b)")
    with pytest.raises(AssertionError) as caught:
        GetDefiningArgInfoList(atom)
    ((node, text),) = caught.value.args
    assert node is atom
    assert text is None


@pytest.mark.parametrize("context", [True, 2**40, 7])
def test_the_token_index_past_a_node_is_one_more_than_its_context(context: int) -> None:
    node = CNode()
    node.fContext = context
    assert GetTokenEndIndex(node) == context + 1


@pytest.mark.parametrize("context", [None, (1, 2), object()])
def test_a_context_that_is_no_number_has_no_token_index(context: object) -> None:
    node = CNode()
    node.fContext = context
    with pytest.raises(TypeError):
        GetTokenEndIndex(node)
