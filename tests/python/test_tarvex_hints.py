"""Walks by a dict of callables, and the hint walker as a host drives it."""

from __future__ import annotations

import gc
import weakref
from collections.abc import Callable

import pytest

from lines import analyzer, expression, line_of, nested, parse, parser, records, wide
from quillet.logicalline import CLogicalLine
from quillet.symbolinfo import kTypeHintPrefix
from quillet.tarvex import (
    CAtomExpr,
    CDispatchWalker,
    CExprStmt,
    CFuncdefStmt,
    CNameLiteral,
    CNode,
    CNodeToTextConverterImpl,
    CNodeWalker,
    CTrailer,
    CTypeHintWalker,
    kPy3DefaultGrammar,
)

V3 = (3, 8, 0)


def hint(text: str) -> bytes:
    return kTypeHintPrefix + text.encode()


# ---- the dispatch walker ----


def visited(answers: dict[type, object], text: str = "f(a.b, c)") -> list[object]:
    seen: list[object] = []
    table: dict[type, object] = {}
    for cls, answer in answers.items():
        if answer is False:
            table[cls] = False
        else:
            table[cls] = lambda walker, node, answer=answer: (seen.append(node.fText or type(node).__name__), answer)[1]
    walker = CDispatchWalker(table)
    walker.Walk(parse(text), CLogicalLine(), False)
    return seen


def test_an_absent_class_has_its_children_visited() -> None:
    assert visited({CNameLiteral: None}) == ["f", "a", "b", "c"]


@pytest.mark.parametrize(("answer", "descends"), [(None, False), (0, False), (True, True), ("yes", True)])
def test_the_answer_of_a_visit_decides_on_the_descent(answer: object, descends: bool) -> None:
    seen = visited({CAtomExpr: answer, CNameLiteral: None})
    assert seen == (["CAtomExpr", "f", "CAtomExpr", "a", "b", "c"] if descends else ["CAtomExpr"])


def test_false_in_the_table_calls_nothing_and_prunes() -> None:
    assert visited({CAtomExpr: False, CNameLiteral: True}) == []


def test_only_the_exact_class_is_looked_up() -> None:
    assert visited({CNode: None}, "f") == []

    class Mine(CNameLiteral):
        pass

    node = Mine()
    node.fText = "mine"
    seen: list[CNode] = []
    CDispatchWalker({CNameLiteral: lambda walker, node: seen.append(node)}).Walk(node, CLogicalLine(), False)
    assert seen == []
    CDispatchWalker({Mine: lambda walker, node: seen.append(node)}).Walk(node, CLogicalLine(), False)
    assert seen == [node]


def test_visits_see_the_walk() -> None:
    line = CLogicalLine()
    tree = parse("f(a)")
    stacks: list[list[CNode]] = []

    def visit(walker: CDispatchWalker, node: CNode) -> None:
        assert walker._fLogical is line
        stacks.append(walker._fNodeStack)
        with pytest.raises(ValueError, match=r"^Only one logical may be walked at a time$"):
            walker.Walk(node, line, False)

    walker = CDispatchWalker({CNameLiteral: visit})
    walker.Walk(tree, line, False)
    assert [[type(node).__name__ for node in stack] for stack in stacks] == [
        ["CAtomExpr", "CNameLiteral"],
        ["CAtomExpr", "CTrailer", "CNameLiteral"],
    ]
    assert stacks[0][0] is tree
    assert (walker._fLogical, walker._fVisitCount, walker._fNodeStack) == (None, 0, [])


@pytest.mark.parametrize(("depth", "message"), [(40, None), (41, "Maximum recurse count in _VisitNode exceeded")])
def test_the_depth_of_a_walk(depth: int, message: str | None, capsys: pytest.CaptureFixture[str]) -> None:
    node = CNode()
    for _ in range(depth - 1):
        outer = CNode()
        outer.fChildren = [node]
        node = outer
    walker = CDispatchWalker({})
    walker.Walk(node, CLogicalLine(), False)
    expected = "" if message is None else f"RuntimeError raised in CNodeWalker.Walk: {message}\n"
    assert capsys.readouterr().out == expected
    walker.Walk(node.GetChild(0), CLogicalLine(), False)
    assert capsys.readouterr().out == ""


def test_the_visits_of_a_walk(capsys: pytest.CaptureFixture[str]) -> None:
    node = CNode()
    node.fChildren = [CNode() for _ in range(10000)]
    CDispatchWalker({}).Walk(node, CLogicalLine(), False)
    assert "Maximum number of calls to _VisitNode exceeded" in capsys.readouterr().out
    node.fChildren.pop()
    CDispatchWalker({}).Walk(node, CLogicalLine(), False)
    assert capsys.readouterr().out == ""


def test_a_visit_may_visit_the_children_by_itself() -> None:
    seen: list[str | None] = []

    def visit_children(walker: CDispatchWalker, node: CNode) -> bool:
        for child in node.fChildren or []:
            walker._VisitNode(child)
        return False

    walker = CDispatchWalker({CNameLiteral: lambda walker, node: seen.append(node.fText), CTrailer: visit_children})
    walker.Walk(parse("f(a, b)(c)"), CLogicalLine(), False)
    assert seen == ["f", "a", "b", "c"]


def test_a_visit_may_visit_the_nodes_of_another_source() -> None:
    seen: list[str | None] = []

    def visit(walker: CDispatchWalker, node: CNode) -> None:
        if not seen:
            seen.append(None)
            other = parser().ParseToNode(line_of("other_a.other_b"), False)
            walker._VisitNode(other)
            parser().DiscardNode(other)
        seen.append(node.fText)

    CDispatchWalker({CNameLiteral: visit}).Walk(parse("first(second)"), CLogicalLine(), False)
    assert seen == [None, "other_a", "other_b", "first", "second"]


@pytest.mark.parametrize(
    "make",
    [lambda: CDispatchWalker({}), lambda: CTypeHintWalker(V3, kPy3DefaultGrammar, None)],
    ids=["dispatch", "hints"],
)
def test_a_walk_lets_go_of_its_line(make: Callable[[], CDispatchWalker]) -> None:
    class Line(CLogicalLine):
        pass

    walker, line = make(), Line()
    walker.Walk(expression("x"), line, False)
    assert walker._fLogical is None
    gone = weakref.ref(line)
    del line
    assert gone() is None

    line = Line()
    line.walker = walker
    walker._fLogical = line
    gone = weakref.ref(line)
    del line, walker
    gc.collect()
    assert gone() is None


def test_a_line_that_a_visit_hands_in_is_taken_back_at_the_end() -> None:
    class Line(CLogicalLine):
        pass

    gone: list[weakref.ref[CLogicalLine]] = []

    def visit(walker: CDispatchWalker, node: CNode) -> None:
        line = Line()
        gone.append(weakref.ref(line))
        walker._fLogical = line
        assert walker._fLogical is line
        assert [ref() for ref in gone] != [None] * len(gone)

    walker = CDispatchWalker({CNameLiteral: visit})
    walker.Walk(parse("f(a)"), CLogicalLine(), False)
    assert walker._fLogical is None
    walker.Walk(parse("f()"), CLogicalLine(), False)
    gc.collect()
    assert [ref() for ref in gone] == [None] * 3


def test_what_a_visit_raises() -> None:
    def fail(walker: CDispatchWalker, node: CNode) -> None:
        raise LookupError("here")

    walker = CDispatchWalker({CNameLiteral: fail})
    with pytest.raises(LookupError, match="here"):
        walker.Walk(parse("x"), CLogicalLine(), False)
    assert walker._fLogical is None
    raised = SyntaxError("mine", ("f", 1, 2, "t"))
    walker._fDispatchDict[CNameLiteral] = lambda walker, node: (_ for _ in ()).throw(raised)
    with pytest.raises(SyntaxError) as caught:
        walker.Walk(parse("x"), CLogicalLine(), False)
    assert caught.value is raised


def test_a_runtime_error_of_a_visit_is_printed(capsys: pytest.CaptureFixture[str]) -> None:
    def fail(walker: CDispatchWalker, node: CNode) -> None:
        raise RuntimeError("enough")

    CDispatchWalker({CNameLiteral: fail}).Walk(parse("x"), CLogicalLine(), False)
    assert capsys.readouterr().out == "RuntimeError raised in CNodeWalker.Walk: enough\n"


def test_a_table_is_a_dict() -> None:
    with pytest.raises(TypeError, match="Expected dict, got list"):
        CDispatchWalker([])
    with pytest.raises(AttributeError):
        CDispatchWalker(None).Walk(parse("x"), CLogicalLine(), False)
    table: dict[type, object] = {}
    assert CDispatchWalker(table)._fDispatchDict is table


def test_a_walker_and_its_callables_are_collected_together() -> None:
    class Host:
        def __init__(self) -> None:
            self.walker = CDispatchWalker({CNameLiteral: self.visit})

        def visit(self, walker: CDispatchWalker, node: CNode) -> None:
            pass

    host = Host()
    gone = weakref.ref(host)
    del host
    gc.collect()
    assert gone() is None


# ---- the hint walker ----


@pytest.mark.parametrize(
    ("text", "expected"),
    [
        ("x = 1  # type: int", [(b"x", hint("int"))]),
        ("x = 1  # type: ignore", []),
        ("x = 1  # type: int  # why", [(b"x", hint("int"))]),
        ("a, b = 1, 2  # type: int, str", [(b"a", hint("int")), (b"b", hint("str"))]),
        ("a, b = f()  # type: int", []),
        ("self.x = 1  # type: int", [(b"self.x", hint("int"))]),
        ("x[0] = 1  # type: int", []),
        ("x: 'List[int]'", [(b"x", hint("List[int]"))]),
        ("x: List[int] = []", [(b"x", hint("List[int]"))]),
        ("for x in y:  # type: int", [(b"x", hint("int"))]),
        ("with a as b:  # type: int", [(b"b", hint("int"))]),
        ("with a, b as c:  # type: int", [(b"c", hint("int"))]),
        ("x = (1,  # type: int\n  2)", []),
        (
            "def f(a, b):  # type: (int, str) -> bool",
            [(b"a", hint("int")), (b"b", hint("str")), (b"return", hint("bool"))],
        ),
        ("def f(a: int) -> str:", [(b"a", hint("int")), (b"return", hint("str"))]),
    ],
)
def test_hints(text: str, expected: list[tuple[bytes, bytes]]) -> None:
    assert [record for record in records(text) if record[1].startswith(kTypeHintPrefix)] == expected


def test_an_error_in_a_hint_lands_in_the_comment() -> None:
    line = line_of("x = 1  # type: 1 +")
    error = analyzer().AnalyzeSingleLogical(line, False)
    assert isinstance(error, SyntaxError)
    assert (error.msg, error.lineno, error.offset) == ("invalid syntax", 1, len("x = 1  # type: 1 +") + 1)


def walker_on(text: str) -> tuple[CTypeHintWalker, CLogicalLine]:
    walker = CTypeHintWalker(V3, kPy3DefaultGrammar, CNodeWalker(V3))
    line = line_of(text)
    walker._fLogical = line
    walker._fCommentHintCount = 1
    return walker, line


def test_construction_of_a_hint_walker() -> None:
    general = CNodeWalker(V3)
    walker = CTypeHintWalker(V3, kPy3DefaultGrammar, general)
    assert isinstance(walker, CDispatchWalker)
    assert walker._fGeneralNodeWalker is general
    assert walker._fCommentHintCount == 0
    assert walker._fHintParser is walker._fHintParser
    for converter in ("_fNameConv", "_fHintConv"):
        assert isinstance(getattr(walker, converter), CNodeToTextConverterImpl)
        assert getattr(walker, converter) is getattr(walker, converter)
        with pytest.raises(AttributeError):
            setattr(walker, converter, CNodeToTextConverterImpl())
    assert walker._fNameConv.TextForNode(expression("a[b]")) == b"a[]"
    assert walker._fHintConv.TextForNode(expression("a['b']")) == b"a['b']"
    assert walker._fDispatchDict[CNameLiteral] is False
    assert walker._fDispatchDict[CFuncdefStmt] is CTypeHintWalker._VisitFuncdefStmt
    assert CTypeHintWalker(V3, kPy3DefaultGrammar, None)._fGeneralNodeWalker is None
    with pytest.raises(TypeError, match="Expected CNodeWalker, got int"):
        CTypeHintWalker(V3, kPy3DefaultGrammar, 1)


@pytest.mark.parametrize(
    ("comment", "expected"),
    [
        ("# type: int", "        int"),
        ("#type:int", "      int"),
        ("# note # type: int", " " * 14 + " int"),
        ("# mytype: int", None),
        ("# see type: int", None),
        ("# type: ignore", None),
        ("# type: ignore[x]", "        ignore[x]"),
        ("# type:", ""),
        ("# nothing", None),
        ("# type: int # why", "        int"),
    ],
)
def test_the_hint_of_a_comment(comment: str, expected: str | None) -> None:
    walker, _ = walker_on("x")
    assert walker._GetHintFromComment(comment) == expected


def test_finding_comments() -> None:
    walker, line = walker_on("x = (1,  # type: int\n  2)  # two")
    node = parse("x = (1,\n  2)")
    assert walker._FindComment(0) == ("# type: int", 5)
    assert walker._FindComment(1, line) == ("# two", 8)
    assert walker._FindComment(2) == (None, -1)
    assert walker._FindComment(0, CLogicalLine()) == (None, -1)
    assert walker._GetRowRange(node.GetChild(0)) == (0, 1)
    assert walker._FindEndingTypeComment(node.GetChild(0)) == ("        int", 5)
    walker._fCommentHintCount = 0
    assert walker._FindEndingTypeComment(node) == (None, -1)


@pytest.mark.parametrize(
    ("text", "dotted"),
    [("a", True), ("a.b", True), ("_a1.b", True), ("", True), ("1a", False), ("a b", False), ("é.ü", True)],
)
def test_dotted_names(text: str, dotted: bool) -> None:
    assert walker_on("x")[0]._IsDottedName(text) is dotted


def test_hints_by_name() -> None:
    walker, line = walker_on("x = 1  # type: List[int]")
    node = walker._ParseHint("               List[int]", 3, True)
    assert line.fTypeEquivs == [(b"List", b":g:"), (b"int", b":g:")]
    assert walker._GetHintInfoStr(node) == hint("List[int]")
    assert walker._GetHintInfoStr(None) is None
    line.ClearDerivedInfo()
    gc.collect()
    assert walker._GetHintInfoStr(node) == hint("List[int]")
    walker._ProcessNameAndHintNodes(expression("a.b"), node, False)
    walker._ProcessNameAndHintNodes(expression("p"), node, True)
    walker._AddSymInfo("q", b"info", False)
    assert line.fTypeEquivs == [(b"a.b", hint("List[int]")), (b"q", b"info")]
    assert line.fArgTypeEquivs == [(b"p", hint("List[int]"))]
    walker._fHintParser.DiscardNode(node)
    assert walker._ParseHint("a\nb", 3, False) is None
    with pytest.raises(SyntaxError) as caught:
        walker._RaiseHintSyntaxError(3, 2)
    assert caught.value.offset == 7 + 2 + 1
    assert walker._VisitExprStmt(parse("x = 1")) is False
    walker._fCommentHintCount = 0
    assert walker._VisitFuncdefStmt(parse("def f():")) is None
    walker._fLogical = None


@pytest.mark.parametrize(
    ("text", "tokens"),
    [
        ("(int, str) -> bool", "def function ( a : int , a : str ) -> bool :"),
        ("(...) -> int", "def function ( ) -> int :"),
        ("() -> None", "def function ( ) -> None :"),
        ("(int,) -> None", "def function ( a : int , ) -> None :"),
        ("(Dict[int, str]) -> None", "def function ( a : Dict [ int , str ] ) -> None :"),
        ("(*int) -> x", "def function ( a : * int ) -> x :"),
    ],
)
def test_signature_comments_are_rewritten(text: str, tokens: str) -> None:
    walker, _ = walker_on("x")
    rewritten, offsets = walker._RewriteFuncdefCommentHint(text)
    assert rewritten == tokens.split()
    assert len(offsets) == len(rewritten)
    assert offsets[:2] == [-13, -9]
    assert offsets[2] == 0


def test_signatures_by_name() -> None:
    walker, line = walker_on("def f(a, b):  # type: (int, str) -> bool")
    node = walker._ParseFuncdefCommentHint("(int, str) -> bool", 8)
    assert type(node) is CFuncdefStmt
    line.AppendArgTypeEquiv(b"a", b":s:")
    walker._ProcessFuncdefComment("(int, str) -> bool", 8, line, True)
    assert line.fArgTypeEquivs[1:3] == [(b"a", hint("int")), (b":A:1", hint("str"))]
    empty = CLogicalLine()
    with pytest.raises(TypeError):
        walker._ProcessFuncdefComment("(int) -> bool", 8, empty, True)
    walker._fLogical = None


def test_a_first_comment_of_a_body_is_a_signature() -> None:
    line = line_of("# type: (int) -> str")
    assert analyzer().AnalyzeSingleLogical(line, False, True) is None
    assert [record for record in line.fTypeEquivs if record[1].startswith(kTypeHintPrefix)] == [
        (b":A:0", hint("int")),
        (b"return", hint("str")),
    ]
    line = line_of("# type: (int) -> str")
    assert analyzer().AnalyzeSingleLogical(line, False, False) is None
    assert line.fTypeEquivs is None


def test_a_host_walks_hints_by_itself() -> None:
    walker = CTypeHintWalker(V3, kPy3DefaultGrammar, CNodeWalker(V3))
    line = line_of("x: int = 1")
    walker.Walk(parse("x: int = 1"), line, False)
    assert line.fTypeEquivs == [(b"x", hint("int"))]
    assert type(parse("x: int = 1")) is CExprStmt


def test_the_base_operations_go_by_the_dict_of_a_hint_walker(capsys: pytest.CaptureFixture[str]) -> None:
    walker, line = walker_on("x: int = 1")
    CDispatchWalker._VisitNode(walker, parse("x: int = 1"))
    assert line.fTypeEquivs == [(b"x", hint("int"))]
    walker._fLogical = None
    line = line_of("y: int = 1")
    CDispatchWalker.Walk(CTypeHintWalker(V3, kPy3DefaultGrammar, None), parse("y: int = 1"), line, False)
    assert line.fTypeEquivs == [(b"y", hint("int"))]
    CDispatchWalker.Walk(walker, nested(100000), line_of("x"), False)
    assert capsys.readouterr().out.endswith("Maximum recurse count in _VisitNode exceeded\n")


def knot() -> CNode:
    node = CNode()
    node.fChildren = [node, node]
    return node


@pytest.mark.parametrize(
    ("tree", "message"),
    [
        (lambda: nested(40), None),
        (lambda: nested(41), "Maximum recurse count in _VisitNode exceeded"),
        (lambda: nested(200000), "Maximum recurse count in _VisitNode exceeded"),
        (knot, "Maximum recurse count in _VisitNode exceeded"),
        (lambda: wide(10000), None),
        (lambda: wide(10001), "Maximum number of calls to _VisitNode exceeded"),
    ],
)
def test_the_limits_of_a_walk_for_hints(
    tree: Callable[[], CNode], message: str | None, capsys: pytest.CaptureFixture[str]
) -> None:
    walker = CTypeHintWalker(V3, kPy3DefaultGrammar, None)
    walker.Walk(tree(), line_of("x"), False)
    expected = "" if message is None else f"RuntimeError raised in CNodeWalker.Walk: {message}\n"
    assert capsys.readouterr().out == expected
    assert (walker._fLogical, walker._fVisitCount, walker._fNodeStack) == (None, 0, [])


def test_a_refused_walk_leaves_the_line_that_was_handed_in() -> None:
    class Line(CLogicalLine):
        pass

    for make in (lambda: CDispatchWalker({}), lambda: CTypeHintWalker(V3, kPy3DefaultGrammar, None)):
        walker, line = make(), Line()
        walker._fLogical = line
        kept = weakref.ref(line)
        del line
        with pytest.raises(ValueError, match=r"^Only one logical may be walked at a time$"):
            walker.Walk(expression("x"), CLogicalLine(), False)
        gc.collect()
        assert walker._fLogical is kept()
        assert walker._fLogical is not None
    assert isinstance(walker, CTypeHintWalker)
    walker._AddSymInfo("a", "b", False)
    assert walker._fLogical.fTypeEquivs == [(b"a", b"b")]
    walker.Walk(None, CLogicalLine(), True)
    assert walker._fLogical is kept()
    walker._fLogical = None


@pytest.mark.parametrize(
    ("operation", "wanted"),
    [
        ("_VisitExprStmt", "CExprStmt"),
        ("_VisitForStmt", "CForStmt"),
        ("_VisitWithStmt", "CWithStmt"),
        ("_VisitFuncdefStmt", "CFuncdefStmt"),
    ],
)
def test_visits_of_statements_are_typed(operation: str, wanted: str) -> None:
    walker, _ = walker_on("x = 1  # type: int")
    with pytest.raises(TypeError, match=f"^Expected {wanted}, got CClassdefStmt$"):
        getattr(walker, operation)(parse("class C(a):"))
    with pytest.raises(TypeError, match=f"^Expected {wanted}, got NoneType$"):
        getattr(walker, operation)(None)


def test_rows_of_a_tree_without_an_end() -> None:
    walker, _ = walker_on("x")
    with pytest.raises(RecursionError, match=r"^maximum recursion depth exceeded$"):
        walker._GetRowRange(knot())


def test_annotations_need_no_signature() -> None:
    def used_nodes(walker: CTypeHintWalker) -> list[str]:
        """The classes of which the parser of hints ever made a node."""
        return [info.fName for info in walker._fHintParser._fNodeFactory._fClassInfoList if info.fFirstFree is not None]

    walker = CTypeHintWalker(V3, kPy3DefaultGrammar, CNodeWalker(V3))
    line = line_of("def f(a: int, *b: str) -> bool:")
    walker.Walk(parse("def f(a: int, *b: str) -> bool:"), line, False)
    assert line.fArgTypeEquivs == [(b"a", hint("int")), (b"b", hint("str")), (b"return", hint("bool"))]
    assert line.fTypeEquivs is None
    assert used_nodes(walker) == []
    line = line_of("def f(a: int):  # type: (str) -> bool")
    line.AppendArgTypeEquiv(b"a", b":s:")
    walker.Walk(parse("def f(a: int):  # type: (str) -> bool"), line, False)
    assert used_nodes(walker) != []


@pytest.mark.parametrize(
    ("tok_types", "hints"),
    [
        (None, [(b"x", b":h:int")]),
        ([1, 22, 2, 202], [(b"x", b":h:int")]),
        ([1, 22, 2, 2], []),
        ([], []),
        ([1, 22, 2, None, "202"], []),
    ],
)
def test_a_comment_is_what_the_list_of_types_says(tok_types: list[object] | None, hints: list[object]) -> None:
    places = [(0, 0), (0, 2), (0, 4), (0, 7)]
    line = CLogicalLine(toks=["x", "=", "1", "# type: int"], positions=places, tok_types=tok_types)
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert [pair for pair in line.fTypeEquivs if pair[1].startswith(b":h:")] == hints
