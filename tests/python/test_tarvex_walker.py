"""The symbol walker as a host drives it: walks, limits, state, and its operations by name."""

from __future__ import annotations

import gc
import weakref

import pytest

from lines import expression, line_of, nested, parse, parser, wide
from quillet.logicalline import CLogicalLine
from quillet.symbolinfo import kGetPrefix, kSetPrefix
from quillet.tarvex import CAtomExpr, CNodeToTextConverterImpl, CNodeWalker

V3 = (3, 8, 0)


def walk(text: str, walker: CNodeWalker | None = None) -> list[tuple[bytes, bytes]]:
    line = line_of(text)
    node = parser().ParseToNode(line, False)
    (walker or CNodeWalker(V3)).Walk(node, line)
    parser().DiscardNode(node)
    return line.fTypeEquivs or []


@pytest.mark.parametrize(
    ("version", "py3"), [((2, 7), False), ((2, 7, 18), False), ((3, 0), True), ((3, 8, 1), True), ((3,), False)]
)
def test_the_language_mode(version: tuple[int, ...], py3: bool) -> None:
    assert CNodeWalker(version)._fPy3 is py3


def test_a_new_walker() -> None:
    walker = CNodeWalker(V3)
    assert walker._fLogical is None
    assert (walker._fLoadNameContext, walker._fStoreWithinSubExpr) == (True, False)
    assert (walker._fLoadedNames, walker._fStoredNames) == ({}, {})
    assert (walker._fVisitCount, walker._fRecurseCount, walker._fMaxVisits, walker._fMaxRecurseCount) == (
        0,
        0,
        10000,
        40,
    )
    assert (walker._fIncludeExprText, walker._fIncludeOperatorExpressions) == (True, True)
    assert walker._fMaxOperatorExpressionLength == 120
    converter = walker._fToText
    assert isinstance(converter, CNodeToTextConverterImpl)
    assert converter is walker._fToText
    assert (converter._fIncludeBracketText, converter._fIncludeStringContents, converter._fIncludeArgText) == (
        True,
    ) * 3
    with pytest.raises(AttributeError):
        walker._fToText = converter
    walker._fIncludeExprText = False
    walker._fMaxOperatorExpressionLength = 5
    walker._fPy3 = 0
    assert (walker._fIncludeExprText, walker._fMaxOperatorExpressionLength, walker._fPy3) == (False, 5, False)


def test_reads_come_once_and_behind_what_is_defined() -> None:
    assert walk("x + x") == [(b"x", kGetPrefix)]
    assert walk("y = x") == [(b"y", kSetPrefix), (b"y", b"x"), (b"x", kGetPrefix)]
    assert all(info != kGetPrefix for _, info in walk("import a"))


def test_a_walk_of_nothing_changes_nothing() -> None:
    walker = CNodeWalker(V3)
    assert walker.Walk(None, None) is None
    assert walker._fLogical is None


@pytest.mark.parametrize(
    ("tree", "fits", "message"),
    [
        (lambda: nested(40), True, ""),
        (lambda: nested(41), False, "Maximum recurse count in _VisitNode exceeded"),
        (lambda: wide(10000), True, ""),
        (lambda: wide(10001), False, "Maximum number of calls to _VisitNode exceeded"),
    ],
)
def test_the_limits_of_a_walk(tree: object, fits: bool, message: str, capsys: pytest.CaptureFixture[str]) -> None:
    walker = CNodeWalker(V3)
    line = CLogicalLine()
    walker.Walk(tree(), line)
    out = capsys.readouterr().out
    if fits:
        assert out == ""
        assert line.fTypeEquivs == [(b"x", kGetPrefix)]
    else:
        assert out == f"RuntimeError raised in CNodeWalker.Walk: RuntimeError('{message}')\n"
        assert line.fTypeEquivs is None
    assert (walker._fLogical, walker._fVisitCount, walker._fRecurseCount) == (None, 0, 0)
    assert (walker._fLoadedNames, walker._fStoredNames) == ({}, {})
    assert walk("x", walker) == [(b"x", kGetPrefix)]


def test_definitions_in_front_of_a_limit_stay(capsys: pytest.CaptureFixture[str]) -> None:
    walker = CNodeWalker(V3)
    walker._fMaxVisits = 3
    assert walk("x = f(a, b, c)", walker)[0] == (b"x", kSetPrefix)
    assert "Maximum number of calls" in capsys.readouterr().out


def test_a_syntax_error_leaves_an_idle_walker() -> None:
    walker = CNodeWalker(V3)
    with pytest.raises(SyntaxError, match="Generator expression must be parenthesized if not sole argument"):
        walk("f(a, b for b in c)", walker)
    assert walker._fLogical is None
    assert walk("x", walker) == [(b"x", kGetPrefix)]


def test_only_one_line_is_walked_at_a_time() -> None:
    walker = CNodeWalker(V3)

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            assert walker._fLogical is self
            with pytest.raises(ValueError, match=r"^Only one logical may be walked at a time$"):
                walker.Walk(expression("y"), CLogicalLine())
            super().AppendTypeEquiv(name, equiv)

    line = Line()
    walker.Walk(expression("x"), line)
    assert line.fTypeEquivs == [(b"x", kGetPrefix)]


def test_named_arguments() -> None:
    assert (b"y", kSetPrefix) in walk("f(y := 1)")
    assert (b"y", kSetPrefix) not in walk("f(y)")


def test_operations_by_name_between_walks() -> None:
    walker = CNodeWalker(V3)
    line = CLogicalLine()
    with pytest.raises(AttributeError):
        walker._AddTypeEquiv("x", "info")
    walker._fLogical = line
    assert walker._fLogical is line
    walker._AddTypeEquiv("x", b"info")
    walker._AddNameDefined("é")
    walker._AddArgInfoBytes(b"p", b"info")
    walker._AddArgNameDefined("p")
    assert line.fTypeEquivs == [(b"x", b"info"), ("é".encode(), kSetPrefix)]
    assert line.fArgTypeEquivs == [(b"p", b"info"), (b"p", kSetPrefix)]
    walker._VisitNode(expression("f(a.b)"))
    assert list(walker._fLoadedNames) == ["f", "a", "a.b"]
    assert set(walker._fLoadedNames.values()) == {""}
    line.ClearDerivedInfo()
    walker._VisitStoreContextNode(expression("c"), within_sub_expr=True)
    walker._VisitStoreContextNode(expression("c"), True)
    assert walker._fStoredNames == {"c": ":w:0;:w:0"}
    walker._VisitLoadContextNode(expression("d"))
    walker._ProcessLoadName("e")
    walker._ProcessNamesFound(expression("x"))
    assert line.fTypeEquivs[-2:] == [(b"c", b":w:0"), (b"c", b":w:0")]
    assert (b"e", kGetPrefix) in line.fTypeEquivs
    walker._fLogical = None


def test_equivalents_by_name() -> None:
    walker = CNodeWalker(V3)
    assert walker._TypeEquivForNode(expression("a.b")) == b"a.b"
    assert walker._TypeEquivForNode(expression("a.b"), b"[0]") == b"a.b[0]"
    assert walker._TypeEquivForNode(expression("1")) == b":l:int: 1"
    with pytest.raises(TypeError, match="Expected COperatorExpression, got"):
        walker._TypeEquivForOperatorExpression(expression("a"))
    line = CLogicalLine()
    walker._fLogical = line
    walker._AppendEquivNode(expression("x"), expression("y"))
    walker._AppendSubscriptedEquivNode(expression("x"), expression("y"), 2)
    walker._AddNodeInfoStr(expression("z"), ":i:info")
    walker._ProcessTargets(expression("t"), expression("u"))
    assert line.fTypeEquivs == [
        (b"x", kSetPrefix),
        (b"x", b"y"),
        (b"x", kSetPrefix),
        (b"x", b"y[2]"),
        (b"z", b":i:info"),
        (b"t", kSetPrefix),
        (b"t", b"u"),
    ]
    walker._fLogical = None


def test_wrong_nodes_are_type_errors() -> None:
    walker = CNodeWalker(V3)
    with pytest.raises(TypeError, match="Expected CNode, got str"):
        walker.Walk("x", CLogicalLine())
    with pytest.raises(TypeError, match="Expected CLogicalLine, got NoneType"):
        walker.Walk(expression("x"), None)
    with pytest.raises(TypeError, match="Expected CImportNamesStmt, got CNameLiteral"):
        walker._VisitImportNames(expression("x"))
    with pytest.raises(ValueError, match=r"^Node is not a <class 'quillet.tarvex.CAtomExpr'>: <class"):
        walker._RaiseIfNotInstance(expression("x"), CAtomExpr)
    walker._RaiseIfNotInstance(expression("x.y"), CAtomExpr)


def test_records_of_a_walk_join_a_list_that_the_host_holds() -> None:
    line = line_of("x")
    line.AppendTypeEquiv(b"first", b"info")
    held = line.fTypeEquivs
    CNodeWalker(V3).Walk(parse("x"), line)
    assert held == [(b"first", b"info"), (b"x", kGetPrefix)]
    assert line.fTypeEquivs is held


# ---- a host that is called back in the middle of a walk ----


def names_of(line: CLogicalLine) -> list[str]:
    return [name.decode() for name, _ in line.fTypeEquivs or []]


def use_memory_again() -> None:
    """Lines of many lengths: their texts come where those of lines that are gone have been."""
    lines = [line_of(f"{'z' * length} = 1") for length in range(1, 2000, 3)]
    assert all(len(line.fToks) == 3 for line in lines)


def test_a_line_that_is_handed_in_during_a_walk_gets_the_rest() -> None:
    walker = CNodeWalker(V3)
    other = line_of("m = 1")

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            walker._fLogical = other

    names = [f"a_name_of_its_own_{i}" for i in range(40)]
    line = Line()
    line.fToks = line_of("global " + ", ".join(names)).fToks
    node = parser().ParseToNode(line, False)
    walker.Walk(node, line)
    parser().DiscardNode(node)
    del line, node, Line
    gc.collect()
    use_memory_again()
    assert names_of(other) == names[1:]
    assert walker._fLogical is None


def test_reads_of_one_line_are_recorded_on_another() -> None:
    walker = CNodeWalker(V3)
    other = line_of("m = 1")

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            walker._fLogical = other

    line = Line()
    line.fToks = line_of("target = [first . second for third in fourth]").fToks
    walker.Walk(parser().ParseToNode(line, False), line)
    del line, Line
    gc.collect()
    assert sorted(set(names_of(other))) == ["first", "first.second", "fourth", "target", "third"]


def test_a_line_that_was_replaced_stays_while_it_is_worked_on() -> None:
    walker = CNodeWalker(V3)
    gone: list[weakref.ref[CLogicalLine]] = []
    seen: list[bool] = []

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            line = Line()
            gone.append(weakref.ref(line))
            walker._fLogical = line
            seen.extend(ref() is not None for ref in gone)

    line = Line()
    walker.Walk(parse("global a, b, c, d"), line)
    assert seen == [True] * 10
    gc.collect()
    assert [ref() for ref in gone] == [None] * 4


def test_no_walk_begins_while_an_operation_is_under_way() -> None:
    walker = CNodeWalker(V3)
    refused: list[str] = []

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            walker._fLogical = None
            with pytest.raises(ValueError, match=r"^Only one logical may be walked at a time$"):
                walker.Walk(expression("y"), CLogicalLine())
            refused.append(name.decode())
            walker._fLogical = self

    walker.Walk(parse("[a for b in c]"), Line())
    assert refused == ["a", "c", "b"]
    refused.clear()
    walker._fLogical = Line()
    walker._VisitNode(parse("x = 1"))
    assert refused == ["x", "x"]
    walker._fLogical = None
    assert walk("x", walker) == [(b"x", kGetPrefix)]


def test_names_of_operations_by_name_outlive_the_line() -> None:
    walker = CNodeWalker(V3)
    names = [f"a_name_of_some_length_{i}" for i in range(20)]
    walker._fLogical = line_of("x")
    for name in names:
        walker._VisitNode(expression(name))
    walker._VisitStoreContextNode(expression("a_stored_name_of_some_length"), True)
    walker._fLogical = None
    gc.collect()
    use_memory_again()
    assert list(walker._fLoadedNames) == names
    line = line_of("other")
    walker.Walk(expression("other"), line)
    walker.Walk(expression("again"), line_of("again"))
    assert names_of(line) == [*names, "other", "a_stored_name_of_some_length"]


def test_stores_that_join_while_stores_are_recorded() -> None:
    walker = CNodeWalker(V3)
    added = iter(range(200))

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            super().AppendTypeEquiv(name, equiv)
            if equiv.startswith(b":w:"):
                for i in added:
                    walker._VisitStoreContextNode(expression(f"added_{i}"), True)

    line = Line()
    walker.Walk(parse("[x for x in y for x in z]"), line)
    stores = [name.decode() for name, info in line.fTypeEquivs or [] if info.startswith(b":w:")]
    assert stores == ["x", "x", *(f"added_{i}" for i in range(200))]


def test_questions_between_the_records_of_an_import() -> None:
    walker = CNodeWalker(V3)
    questions = [expression("'a text' + b + c"), expression("[1, 2]"), expression("f(d.e)")]

    class Line(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            super().AppendTypeEquiv(name, equiv)
            for question in questions:
                walker._TypeEquivForNode(question)
                walker._fToText.TextForNode(question)
            walker._VisitFromImport(inner)

    text = "from a.b import c as d, e, f"
    inner = parse("from q import *")
    line = Line()
    asked = Line.AppendTypeEquiv

    def ask_once(self: CLogicalLine, name: bytes, equiv: bytes) -> None:
        Line.AppendTypeEquiv = CLogicalLine.AppendTypeEquiv
        asked(self, name, equiv)
        Line.AppendTypeEquiv = ask_once

    Line.AppendTypeEquiv = ask_once
    walker.Walk(parse(text), line)
    recorded = [record for record in line.fTypeEquivs or [] if record[0] != b"*"]
    assert recorded == walk(text)
    assert len(line.fTypeEquivs or []) == 2 * len(recorded)


def test_a_walker_and_its_line_are_collected_together() -> None:
    class Line(CLogicalLine):
        pass

    line = Line()
    line.walker = walker = CNodeWalker(V3)
    walker._fLogical = line
    gone = weakref.ref(line)
    del line, walker
    gc.collect()
    assert gone() is None


def test_the_equivalent_of_a_tree_without_an_end() -> None:
    node = expression("(x)")
    children = node.fChildren
    assert children is not None
    children[1] = node
    with pytest.raises(RecursionError, match=r"^maximum recursion depth exceeded$"):
        CNodeWalker(V3)._TypeEquivForNode(node)
