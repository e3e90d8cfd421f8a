"""The host's code in the middle of the core's work: it may give back, drop and change whatever the core has in hand.

Memory that is used again shows itself by names of other statements; under a sanitizer the same steps show any read of
freed memory.
"""

from __future__ import annotations

import contextlib
import gc
import re
import threading
from collections.abc import Callable
from pathlib import Path
from typing import Any

import pytest

from lines import line_of, shape
from quillet.logicalline import CLogicalLine
from quillet.optpgen import ParseError
from quillet.tarvex import (
    CArgInfo,
    CDispatchWalker,
    CNode,
    CNodeClassInfo,
    CNodeWalker,
    CPGenAnalyzerImpl,
    FinishedWithNode,
)


class InterruptedLine(CLogicalLine):
    """A line that has a step done in the middle of its `at`th record."""

    at = 0
    step: Callable[[], object] = staticmethod(lambda: None)

    def count(self) -> None:
        self.at -= 1
        if self.at == 0:
            self.step()

    def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
        super().AppendTypeEquiv(name, equiv)
        self.count()

    def AppendArgTypeEquiv(self, name: bytes, info: bytes) -> None:
        super().AppendArgTypeEquiv(name, info)
        self.count()


STATEMENTS = [
    "first_target = second_target = third_callee(fourth_argument).fifth_attribute",
    "def first_function(second_param, *third_param, fourth_param: fifth_hint = sixth_default) -> seventh_hint:",
    "class first_class(second_base, third_base.fourth_attribute):",
    "import first_package.second_module, third_module as fourth_name",
    "global first_global, second_global, third_global",
    "with first_callee(second_argument) as third_target, fourth_name as fifth_target:",
    "for first_target, (second_target, third_target) in fourth_name.fifth_attribute:",
    "isinstance(first_name, (second_class, third_class.fourth_class))",
    "first_target: second_hint[third_hint] = fourth_name + fifth_name",
    "@first_name.second_name(third_argument, fourth_argument=fifth_name)",
    "first_target = lambda second_param, third_param=fourth_name: fifth_name",
    "f(first_name)(second_name).third_name[fourth_name](fifth_name).sixth_name",
]


# What is left of a tree that was given back has any shape.
BROKEN_TREE = (AssertionError, AttributeError, IndexError, SyntaxError, TypeError, ValueError)


def words(line: CLogicalLine) -> set[str]:
    records = [*(line.fTypeEquivs or []), *(line.fArgTypeEquivs or [])]
    return {word for pair in records for half in pair for word in re.findall(r"[a-z]{5,}_[a-z]+", half.decode())}


@pytest.mark.parametrize("statement", STATEMENTS)
def test_a_tree_that_is_given_back_in_the_middle_of_its_walk(statement: str) -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    toks = list(line_of(statement).fToks)
    others = ["other_name".ljust(len(tok), "s") if "_" in tok else tok for tok in toks]
    held = analyzer.ParseTokenListToNode(["held"], False)
    for at in range(1, 30):
        tree = analyzer.ParseTokenListToNode(toks, False)

        def step(tree: CNode = tree) -> None:
            FinishedWithNode(tree)
            for _ in range(300):
                FinishedWithNode(analyzer.ParseTokenListToNode(others, False))

        line = InterruptedLine("unknown", ("x",), ((0, 0),))
        line.at, line.step = at, step
        with contextlib.suppress(*BROKEN_TREE):
            CNodeWalker((3, 12)).Walk(tree, line)
        assert words(line) <= set(toks)
        if line.at > 0:
            break
    else:
        raise AssertionError("the walk records without end")
    assert held.fText == "held"


def test_the_pool_of_an_argument_in_a_list_that_is_emptied_meanwhile() -> None:
    walker = CNodeWalker((3, 12))
    line = InterruptedLine("unknown", ("x",), ((0, 0),))
    other = CPGenAnalyzerImpl((3, 12))
    tree: Any = other.ParseTokenListToNode(["first_name", ".", "second_name", "(", "third_name", ")"], False)
    atom, trailers = tree.GetAtom(), tree.GetTrailers()

    def step() -> None:
        nonlocal other, tree
        del other, tree
        trailers.clear()
        gc.collect()

    line.at, line.step = 1, step
    walker._fLogical = line
    walker._VisitAtomPlusTrailers(atom, trailers)
    walker._fLogical = None
    assert trailers == []


# ---- what nobody reaches any more ----


class Node(CNode):
    pass


def count_of(cls: type) -> int:
    gc.collect()
    return sum(type(found) is cls for found in gc.get_objects())


def cycle_of_a_bare_root(_: CPGenAnalyzerImpl) -> None:
    root, children, node = CNode(), [], Node()
    root.fChildren = children
    node.kept = children
    children.append(node)


def cycle_of_a_record(_: CPGenAnalyzerImpl) -> None:
    root, children, node = CNode(CNodeClassInfo(Node, 300, "x")), [], Node()
    root.fChildren = children
    node.kept = children
    children.append(node)


def cycle_of_a_parsed_root(analyzer: CPGenAnalyzerImpl) -> None:
    children, node = analyzer.ParseToNode(line_of("x = y"), False).fChildren, Node()
    node.kept = children
    children.append(node)


def cycle_with_the_root(analyzer: CPGenAnalyzerImpl) -> None:
    root, node = analyzer.ParseToNode(line_of("x = y"), False), Node()
    node.kept = root.fChildren
    node.root = root
    root.fChildren.append(node)


def cycle_of_an_argument(_: CPGenAnalyzerImpl) -> None:
    node, arg = Node(), CArgInfo()
    node.kept = arg
    arg.value = node


@pytest.mark.parametrize(
    "make",
    [cycle_of_a_bare_root, cycle_of_a_record, cycle_of_a_parsed_root, cycle_with_the_root, cycle_of_an_argument],
)
def test_the_collector_sees_a_node_that_holds_what_it_stands_in(make: Callable[[CPGenAnalyzerImpl], None]) -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    held = analyzer.ParseToNode(line_of("held = it"), False)
    before = count_of(Node)
    for _ in range(300):
        make(analyzer)
    assert count_of(Node) - before < 50
    assert held.GetChild(0).fText == "held"


def test_a_list_in_a_cycle_reaches_its_node_before_it_goes() -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    top: Any = analyzer.ParseToNode(line_of("x = y + z"), False)
    inner = top.GetChild(2)
    children, node = inner.fChildren, Node()
    node.fText = "added"
    node.kept = children
    node.inner = inner
    children.append(node)
    del inner, children, node
    gc.collect()
    assert [child.fText for child in top.GetChild(2).fChildren] == ["y", "+", "z", "added"]


# ---- memory of nodes that nobody gives back ----

STATM = Path("/proc/self/statm")


def resident_bytes() -> int:
    return int(STATM.read_text().split()[1]) * 4096


def reject(analyzer: CPGenAnalyzerImpl, line: CLogicalLine) -> None:
    with pytest.raises(ParseError):
        analyzer.ParseToNode(line, False)


def drop(analyzer: CPGenAnalyzerImpl, line: CLogicalLine) -> None:
    assert analyzer.ParseToNode(line, False) is not None


@pytest.mark.skipif(not STATM.exists(), reason="the system does not tell the memory of a process")
@pytest.mark.parametrize("is_held", [True, False])
@pytest.mark.parametrize(
    ("once", "statement"),
    [(reject, "x = a + (b, = 1"), (reject, "case [a, {1: b, }, c] = :"), (drop, "a.b = c(d, e)[f] + g")],
)
def test_trees_that_nobody_gives_back_take_no_memory(
    once: Callable[[CPGenAnalyzerImpl, CLogicalLine], None], statement: str, is_held: bool
) -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    held = analyzer.ParseToNode(line_of("held = it"), False)
    if not is_held:
        held = None
    line = line_of(statement)
    for _ in range(2000):
        once(analyzer, line)
    before = resident_bytes()
    for _ in range(20_000):
        once(analyzer, line)
    assert resident_bytes() - before < 3_000_000
    assert held is None or held.GetChild(0).fText == "held"


def analyse_list(analyzer: CPGenAnalyzerImpl) -> None:
    assert analyzer.AnalyzeSingleLogical(line_of(f"x = [{'a, ' * 1000}]"), False) is None


def analyse_hint(analyzer: CPGenAnalyzerImpl) -> None:
    assert analyzer.AnalyzeSingleLogical(line_of(f"x = y  # type: Tuple[{'a, ' * 1000}b]"), False) is None


def give_back(analyzer: CPGenAnalyzerImpl) -> None:
    parser = analyzer._fLogicalParser
    parser.DiscardNode(parser.ParseToNode(line_of(f"x = [{'a, ' * 1000}]"), False))


@pytest.mark.skipif(not STATM.exists(), reason="the system does not tell the memory of a process")
@pytest.mark.parametrize("once", [analyse_list, analyse_hint, give_back])
def test_long_lists_of_children_go_with_their_statement(once: Callable[[CPGenAnalyzerImpl], None]) -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    for _ in range(100):
        once(analyzer)
    before = resident_bytes()
    for _ in range(1000):
        once(analyzer)
    assert resident_bytes() - before < 3_000_000


def test_what_a_wrapper_reaches_is_no_stray() -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    line = line_of("first = second(third, fourth)[fifth] + sixth")
    root = analyzer.ParseToNode(line, False)
    part = analyzer.ParseToNode(line, False).GetChild(2).GetChild(0)
    expected = shape(root), shape(part)
    for i in range(500):
        analyzer.ParseToNode(line_of(f"other{i} = name{i}"), False)
    assert (shape(root), shape(part)) == expected


# ---- threads ----


def in_another_thread(step: Callable[[], object]) -> BaseException | None:
    caught: list[BaseException | None] = []

    def run() -> None:
        try:
            step()
        except BaseException as error:
            caught.append(error)
        else:
            caught.append(None)

    thread = threading.Thread(target=run)
    thread.start()
    thread.join()
    return caught[0]


USES: list[tuple[str, Callable[[CPGenAnalyzerImpl], object]]] = [
    ("the analyzer", lambda analyzer: analyzer.AnalyzeSingleLogical(line_of("x = y"), False)),
    ("the analyzer", lambda analyzer: analyzer._InspectSingleLogical(line_of("x = y"), False)),
    ("the parser", lambda analyzer: analyzer.ParseToNode(line_of("x = y"), False)),
    ("the parser", lambda analyzer: analyzer.ParseTokenListToNode(["x"], False)),
    ("the parser", lambda analyzer: analyzer.GetTypeParameterNodes(("class", "A", "[", "T", "]"))),
    ("the walker", lambda analyzer: analyzer._fNodeWalker._AddNameDefined(b"x")),
    ("the walker", lambda analyzer: analyzer._fTypeHintWalker._AddSymInfo(b"x", b"y", False)),
]


@pytest.mark.parametrize(("what", "use"), USES)
def test_an_analyzer_in_use_is_refused_to_another_thread(what: str, use: Callable[[CPGenAnalyzerImpl], object]) -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    errors: list[BaseException | None] = []
    line = InterruptedLine("assignment", ("x", "=", "y"), ((0, 0), (0, 2), (0, 4)))
    line.at, line.step = 1, lambda: errors.append(in_another_thread(lambda: use(analyzer)))
    assert analyzer.AnalyzeSingleLogical(line, False) is None
    assert [(type(error), str(error)) for error in errors] == [(RuntimeError, f"{what} is in use by another thread")]
    assert line.fTypeEquivs == [(b"x", b":s:"), (b"x", b"y"), (b"y", b":g:")]
    # Free again.
    assert in_another_thread(lambda: analyzer.AnalyzeSingleLogical(line_of("x = y"), False)) is None


def test_a_line_that_was_refused_can_be_analysed_later() -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    other = line_of("a = b")
    line = InterruptedLine("assignment", ("x", "=", "y"), ((0, 0), (0, 2), (0, 4)))
    line.at, line.step = 1, lambda: in_another_thread(lambda: analyzer.AnalyzeSingleLogical(other, False))
    analyzer.AnalyzeSingleLogical(line, False)
    assert not other.fParsed
    analyzer.AnalyzeSingleLogical(other, False)
    assert other.fTypeEquivs == [(b"a", b":s:"), (b"a", b"b"), (b"b", b":g:")]


def test_the_same_thread_may_come_back() -> None:
    analyzer = CPGenAnalyzerImpl((3, 12))
    trees: list[CNode | None] = []
    line = InterruptedLine("assignment", ("x", "=", "y"), ((0, 0), (0, 2), (0, 4)))
    line.at, line.step = 1, lambda: trees.append(analyzer.ParseToNode(line_of("a"), False))
    assert analyzer.AnalyzeSingleLogical(line, False) is None
    assert [tree.fText for tree in trees if tree is not None] == ["a"]


def test_a_second_walk_is_refused_as_such_whoever_begins_it() -> None:
    walker = CNodeWalker((3, 12))
    tree = CPGenAnalyzerImpl((3, 12)).ParseToNode(line_of("x = y"), False)
    errors: list[BaseException | None] = []
    line = InterruptedLine("unknown", ("x",), ((0, 0),))
    line.at = 1
    line.step = lambda: errors.append(in_another_thread(lambda: walker.Walk(tree, line_of("z"))))
    walker.Walk(tree, line)
    (error,) = errors
    assert isinstance(error, ValueError)
    assert str(error) == "Only one logical may be walked at a time"


def test_a_dispatched_walk_is_refused_to_another_thread() -> None:
    errors: list[BaseException | None] = []
    tree = CPGenAnalyzerImpl((3, 12)).ParseToNode(line_of("x"), False)

    def visit(walker: Any, node: Any) -> bool:
        errors.append(in_another_thread(lambda: walker._VisitNode(node)))
        return False

    CDispatchWalker({type(tree): visit}).Walk(tree, line_of("x"), False)
    assert [str(error) for error in errors] == ["the walker is in use by another thread"]
