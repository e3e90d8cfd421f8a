"""What the accessors of the node classes and the operations over nodes give a host."""

from __future__ import annotations

from collections.abc import Callable
from typing import Any

import pytest

from lines import expression, parse, shape
from quillet import tarvex
from quillet.symbolinfo import GetInstanceNameForClass, kTypedLiteralPrefix
from quillet.tarvex import (
    CAtom,
    CNode,
    CNumberLiteral,
    CStringLiteral,
    CTestListStarExpr,
    CTrailer,
    DropSimpleParens,
    ExpandSeqLiteral,
    GetDefiningArgInfoList,
    GetTokenEndIndex,
    GetUsedArgInfoList,
    IsGenExpression,
    IsSetLiteral,
    IsTupleLiteralNode,
)

PY2 = (2, 7)
PY3 = (3, 8, 0)


def shown(value: object) -> object:
    """A result in a form that can be compared: nodes and records by their content."""
    if isinstance(value, CNode):
        return shape(value)
    if isinstance(value, tarvex.CArgInfo):
        return (shown(value.prefix), shown(value.name), shown(value.value), shown(value.type_expr))
    if isinstance(value, tarvex.CAsName):
        return (value.module_name, value.as_name)
    if isinstance(value, list):
        return [shown(item) for item in value]
    if isinstance(value, tuple):
        return tuple(shown(item) for item in value)
    return value


def test_base_class_of_expressions() -> None:
    node = expression("x")
    assert (node.GetSubExpr(0), node.GetSubExprCount()) == (None, 0)


@pytest.mark.parametrize(
    ("text", "version", "asked", "answer"),
    [
        # operators
        (
            "not x",
            PY3,
            lambda n: (n.GetTermCount(), n.GetTerm(7), n.GetOperatorStr(0), n.GetOperatorStr(1)),
            (1, "x", "not", None),
        ),
        ("a not in b", PY3, lambda n: (n.GetOperatorStr(0), n.GetOperatorStr(1)), ("not in", None)),
        ("a is not b", PY3, lambda n: n.GetOperatorStr(0), "is not"),
        (
            "a < b < c",
            PY3,
            lambda n: (n.GetTermCount(), n.GetTerm(2), n.GetTerm(3), n.GetOperatorStr(1), n.GetOperatorStr(-1)),
            (3, "c", None, "<", None),
        ),
        # lists of expressions
        (
            "a, b",
            PY3,
            lambda n: (n.IsTuple(), n.IsGenExpr(), n.GetSubExprCount(), n.GetSubExpr(1)),
            (True, False, 2, "b"),
        ),
        ("a, b,", PY3, lambda n: n.GetSubExprCount(), 2),
        # chains
        (
            "x.y(1)[2]",
            PY3,
            lambda n: (n.GetPrefix(), n.GetAtom(), [t.GetInitialToken() for t in n.GetTrailers()]),
            (None, "x", [".", "(", "["]),
        ),
        ("await x", PY3, lambda n: (n.GetPrefix(), n.GetAtom(), n.GetTrailers()), ("await", "x", [])),
        (
            "await x.y",
            PY3,
            lambda n: (n.GetPrefix(), n.GetAtom(), n.GetTrailers()),
            ("await", "x", [("CTrailer", ".", "y")]),
        ),
        (
            "x.y ** 2",
            PY3,
            lambda n: (n.GetAtom(), n.GetTrailers(), n.GetExponentNode()),
            ("x", [("CTrailer", ".", "y")], "2"),
        ),
        (
            "a.b ** 2",
            PY2,
            lambda n: (n.GetAtom(), n.GetTrailers(), n.GetExponentNode()),
            ("a", [("CTrailer", ".", "b")], "2"),
        ),
        ("a.b", PY2, lambda n: (n.GetAtom(), n.GetExponentNode()), ("a", None)),
        ("f()", PY3, lambda n: (n.GetTrailers()[0].GetNestedNode(), n.GetTrailers()[0].GetDotName()), (None, None)),
        ("f(a)", PY3, lambda n: n.GetTrailers()[0].GetNestedNode(), "a"),
        ("x.y", PY3, lambda n: n.GetTrailers()[0].GetDotName(), "y"),
        # the rest
        ("-x", PY3, lambda n: n.GetUnaryOperator(), "-"),
        ("lambda: 0", PY3, lambda n: (n.GetArgumentsNode(), n.GetBodyExpr()), (None, "0")),
        ("lambda a: b", PY3, lambda n: (n.GetArgumentsNode(), n.GetBodyExpr()), ("a", "b")),
        ("yield from x", PY3, lambda n: (n.GetValue(), n.IsYieldFrom()), ("x", True)),
        ("yield x", PY3, lambda n: (n.GetValue(), n.IsYieldFrom()), ("x", False)),
        ("yield x", PY2, lambda n: (n.GetValue(), n.IsYieldFrom()), ("x", False)),
        (
            "(y := 1)",
            PY3,
            lambda n: (n.GetChild(1).GetAssignedName(), n.GetChild(1).GetRightHandExpression()),
            ("y", "1"),
        ),
        # comprehensions
        ("[a for a in b if c]", PY3, lambda n: comp(n), (False, "a", "b", ("CNode", "if", "c"))),
        ("[a for a in b]", PY2, lambda n: comp(n), (False, "a", "b", None)),
        ("[a async for a in b]", PY3, lambda n: comp(n), (True, "a", "b", None)),
        (
            "[a, b,]",
            PY2,
            lambda n: (n.GetChild(1).GetSubExprCount(), n.GetChild(1).GetSubExpr(1), n.GetChild(1).GetSubExpr(2)),
            (2, "b", None),
        ),
        # atoms
        ("[]", PY3, lambda n: (n.GetSubExprCount(), n.GetSubExpr(0), n.GetInitialBracket()), (0, None, "[")),
        ("[x]", PY3, lambda n: (n.GetSubExprCount(), n.GetSubExpr(0)), (1, "x")),
        ("(x)", PY3, lambda n: n.GetSubExprCount(), 0),
        ("(x, y)", PY3, lambda n: (n.GetSubExprCount(), n.GetSubExpr(1)), (2, "y")),
        ("[(1, 2)]", PY3, lambda n: (n.GetSubExprCount(), n.GetSubExpr(0)), (2, "1")),
        ("{1, 2}", PY3, lambda n: (n.GetSubExprCount(), n.IsLiteral()), (0, True)),
        ("[i for i in x]", PY3, lambda n: (n.IsComprehension(), n.IsLiteral(), n.GetSubExprCount()), (True, False, 0)),
        ("{k: v for k in x}", PY3, lambda n: n.IsComprehension(), True),
        ("'a' 'b'", PY3, lambda n: (n.IsTwoPlusStringLiterals(), n.GetInitialBracket()), (True, None)),
        ("`x`", PY2, lambda n: n.GetInitialBracket(), None),
        # statements
        (
            "a = b = c",
            PY3,
            lambda n: (n.GetEqualCount(), n.GetInitialTestExpr(), n.GetPostEqualsTestExpr(1)),
            (2, "a", "c"),
        ),
        ("a += 1", PY3, lambda n: (n.GetEqualCount(), n.GetAugAssignOp(), n.GetPostEqualsTestExpr(0)), (0, "+=", "1")),
        ("a |= 1", PY3, lambda n: n.GetAugAssignOp(), None),
        ("a @= 1", PY3, lambda n: n.GetAugAssignOp(), None),
        (
            "a: int",
            PY3,
            lambda n: (
                n.GetAnnotatedAssignNode().GetTypeHintNode(),
                n.GetAnnotatedAssignNode().GetPostEqualsTestExpr(),
            ),
            ("int", None),
        ),
        ("a: int = 1", PY3, lambda n: n.GetAnnotatedAssignNode().GetPostEqualsTestExpr(), "1"),
        ("a = 1", PY3, lambda n: n.GetAnnotatedAssignNode(), None),
        (
            "with a, b as c:",
            PY3,
            lambda n: [(i.GetExpression(), i.GetTarget()) for i in n.GetWithItems()],
            [("b", "c")],
        ),
        ("del a, b", PY3, lambda n: n.GetExpressions(), ["a", "b"]),
        ("del a", PY3, lambda n: n.GetExpressions(), ["a"]),
        ("del (a, b)", PY3, lambda n: len(n.GetExpressions()), 1),
        ("global a, b", PY3, lambda n: n.GetUtf8NameList(), ["a", "b"]),
        ("nonlocal a", PY3, lambda n: n.GetUtf8NameList(), ["a"]),
        ("return", PY3, lambda n: type(n).__name__, "CKeywordLiteral"),
        ("return x", PY3, lambda n: n.GetValue(), "x"),
        (
            "for x in y:",
            PY3,
            lambda n: (n.GetTarget(), n.GetInExpression(), n.GetBody(), n.GetElseBody()),
            ("x", "y", "pass", None),
        ),
        ("if x:", PY3, lambda n: n.GetTestExpression(), "x"),
        (
            "def f() -> int:",
            PY3,
            lambda n: (n.GetFunctionName(), n.GetReturnType(), n.GetSuite()),
            ("f", "int", "pass"),
        ),
        ("def f():", PY3, lambda n: (n.GetParameters(), n.GetReturnType()), (("CParametersNode", "(", ")"), None)),
        ("class A:", PY3, lambda n: (n.GetClassName(), n.GetBaseClassList()), ("A", [])),
        ("class A():", PY3, lambda n: n.GetBaseClassList(), []),
        (
            "class A(B, metaclass=C):",
            PY3,
            lambda n: n.GetBaseClassList(),
            [(None, None, "B", None), (None, "metaclass", "C", None)],
        ),
        (
            "@a.b(c)",
            PY3,
            lambda n: (n.GetDottedName(), n.GetUsedArgList()),
            (("CDottedName", "a", ".", "b"), [(None, None, "c", None)]),
        ),
        ("@foo()", PY3, lambda n: n.GetUsedArgList(), []),
        # imports
        ("import a.b as c, d", PY3, lambda n: n.GetAsNameList(), [("a.b", "c"), ("d", None)]),
        ("import a", PY3, lambda n: n.GetAsNameList(), [("a", None)]),
        (
            "from ..a.b import c as d",
            PY3,
            lambda n: (n.GetFromString(), n.GetAsNameList(), n.GetImportStar()),
            ("..a.b", [("c", "d")], False),
        ),
        (
            "from . import (a, b)",
            PY3,
            lambda n: (n.GetFromString(), n.GetAsNameList()),
            (".", [("a", None), ("b", None)]),
        ),
        (
            "from x import *",
            PY3,
            lambda n: (n.GetImportStar(), n.GetAsNameList(), n._GetImportIndex()),
            (True, [("*", None)], 2),
        ),
    ],
)
def test_accessors(text: str, version: tuple[int, ...], asked: Callable[[Any], Any], answer: object) -> None:
    assert shown(asked(parse(text, version))) == answer


def comp(node: Any) -> tuple[object, ...]:
    for_node = node.GetChild(1).GetChild(1)
    return (for_node.IsAsync(), for_node.GetTargetNode(), for_node.GetInNode(), for_node.GetCompIterNode())


def made(cls: type[CNode], *texts: str) -> Any:
    node = cls()
    children = []
    for text in texts:
        child = CNode()
        child.fText = text
        children.append(child)
    node.fChildren = children
    return node


@pytest.mark.parametrize(
    ("call", "error", "text"),
    [
        (lambda: expression("a, b").GetSubExpr(2), ValueError, "^Not enough expressions in list$"),
        (
            lambda: made(CTestListStarExpr, "a", ",").GetSubExpr(0),
            ValueError,
            "^Elenment 0 of .* needs to be a CExpression; fChildren = ",
        ),
        (lambda: made(CTrailer).GetInitialToken(), ValueError, "^Trailer node with no children$"),
        (lambda: made(CAtom).GetInitialBracket(), ValueError, "^Atom node with no children$"),
        (lambda: expression("a = b").GetPostEqualsTestExpr(1), ValueError, "^Not enough ='s$"),
        (lambda: made(tarvex.CForStmt, "for").GetTarget(), IndexError, ""),
        (lambda: tarvex.CForStmt().GetTarget(), TypeError, ""),
        (lambda: made(tarvex.CStarExpression, "*", "x").GetStarredExpression(), TypeError, "Expected CExpression"),
        (lambda: made(tarvex.CFuncdefStmt, "def", "f", "x").GetParameters(), TypeError, "Expected CParametersNode"),
        (lambda: parse("def f() -> ...:").GetReturnType(), TypeError, "Expected CExpression"),
        (lambda: IsSetLiteral(expression("x")), TypeError, "Expected CAtom, got"),
        (lambda: GetDefiningArgInfoList(expression("a + b")), AssertionError, ""),
        (lambda: CAtom.GetSubExpr(expression("x"), 0), TypeError, "Expected CAtom, got"),
        (lambda: expression("a, b").GetSubExpr(1 << 31), OverflowError, "value too large to convert to int"),
    ],
)
def test_failures_that_are_meant(call: Callable[[], object], error: type[Exception], text: str) -> None:
    with pytest.raises(error) as caught:
        call()
    if text:
        caught.match(text)


@pytest.mark.parametrize(
    ("text", "version", "expected"),
    [
        ("def f():", PY3, []),
        ("def f(a):", PY3, [(None, "a", None, None)]),
        ("def f(a, *, b):", PY3, [(None, "a", None, None), ("*", None, None, None), (None, "b", None, None)]),
        ("def f(*a, **k):", PY3, [("*", "a", None, None), ("**", "k", None, None)]),
        ("def f(a: int = 1):", PY3, [(None, "a", "1", "int")]),
        ("def f((a, b), c):", PY2, [[(None, "a", None, None), (None, "b", None, None)], (None, "c", None, None)]),
        ("def f(a=1):", PY2, [(None, "a", "1", None)]),
    ],
)
def test_parameters(text: str, version: tuple[int, ...], expected: list[object]) -> None:
    assert shown(GetDefiningArgInfoList(parse(text, version).GetParameters())) == expected


@pytest.mark.parametrize(
    ("text", "version", "expected"),
    [
        ("f(a)", PY3, [(None, None, "a", None)]),
        ("f(a, b,)", PY3, [(None, None, "a", None), (None, None, "b", None)]),
        ("f(x=1, *y)", PY3, [(None, "x", "1", None), ("*", None, ("CSingleUsedArgumentNode", "*", "y"), None)]),
        ("f(*a)", PY3, [(None, None, ("CSingleUsedArgumentNode", "*", "a"), None)]),
        ("f(b, *a)", PY2, [(None, None, "b", None), ("*", None, "a", None)]),
    ],
)
def test_arguments(text: str, version: tuple[int, ...], expected: list[object]) -> None:
    assert shown(GetUsedArgInfoList(parse(text, version).GetTrailers()[0].GetNestedNode())) == expected


def test_single_arguments() -> None:
    argument = expression("f(i for i in x)").GetTrailers()[0].GetNestedNode()
    assert argument.IsUnparenthesizedGenExpr()
    assert argument.GetValue() is argument
    named = expression("f(y := 1)").GetTrailers()[0].GetNestedNode()
    assert (named.GetNameAssigned().fText, named.GetNamedRightHandExpression().fText) == ("y", "1")
    star = expression("f(**k)").GetTrailers()[0].GetNestedNode()
    assert (star.GetPrefix(), star.GetName(), star.GetValue()) == ("**", None, star)


def test_the_end_of_a_node() -> None:
    assert GetTokenEndIndex(expression("x")) == 1
    assert GetTokenEndIndex(expression("x = f(a)")) == 6


@pytest.mark.parametrize(
    ("token", "is_float", "value"),
    [
        ("10", False, 10),
        ("1_000", False, 1000),
        ("010", False, 10),
        ("0x10", False, None),
        ("0xe", True, None),
        ("10L", False, None),
        ("1j", False, None),
        ("1.5", True, 1.5),
        ("1e5", True, 1e5),
        (".5", True, 0.5),
        ("1.", True, 1.0),
        ("1_0.0", True, 10.0),
        ("1.5j", True, None),
        ("0o7", False, None),
    ],
)
def test_numbers(token: str, is_float: bool, value: object) -> None:
    node = CNumberLiteral()
    node.fText = token
    assert node.IsFloat() is is_float
    result = node.GetNumericValue()
    assert result == value
    assert type(result) is type(value)


@pytest.mark.parametrize(
    ("token", "is_unicode", "is_bytes", "contents", "value"),
    [
        ("''", False, False, "", ""),
        ('""""""', False, False, "", ""),
        ("'a'", False, False, "a", "a"),
        ('rb"""x"""', False, True, "x", b"x"),
        ("u'x'", True, False, "x", "x"),
        ("ur'x'", True, False, "x", "x"),
        ("b'\\x41'", False, True, "\\x41", b"A"),
        ("'\\n'", False, False, "\\n", "\n"),
        ('f"x"', False, False, "x", None),
        ('rf"x"', False, False, "x", None),
        ('Fr"x"', False, False, "x", None),
    ],
)
def test_strings(token: str, is_unicode: bool, is_bytes: bool, contents: str, value: object) -> None:
    node = CStringLiteral()
    node.fText = token
    assert (node.IsUnicode(), node.IsBytes(), node.GetStringContents()) == (is_unicode, is_bytes, contents)
    assert node.GetStringValue() == value


def test_an_unterminated_string_has_contents() -> None:
    node = CStringLiteral()
    node.fText = "'abc"
    assert node.GetStringContents() == "abc"


@pytest.mark.parametrize(
    ("text", "is_set", "is_tuple", "expanded", "dropped"),
    [
        ("{1, 2}", True, False, None, None),
        ("{1}", True, False, None, None),
        ("{1: 2}", False, False, None, None),
        ("{}", False, False, None, None),
        ("()", False, True, [], None),
        ("(x)", False, False, None, "x"),
        ("(x,)", False, True, ["x"], None),
        ("((1, 2))", False, True, ["1", "2"], ("CAtom", "(", ("CTestListStarExpr", "1", ",", "2"), ")")),
        ("((1))", False, False, None, "1"),
        ("[a, b]", False, False, None, None),
    ],
)
def test_literal_predicates(text: str, is_set: bool, is_tuple: bool, expanded: object, dropped: object) -> None:
    node = expression(text)
    assert IsSetLiteral(node) is is_set
    assert IsTupleLiteralNode(node) is is_tuple
    assert shown(ExpandSeqLiteral(node)) == expanded
    inner = DropSimpleParens(node)
    if dropped is None:
        assert inner is node
    else:
        assert shape(inner) == dropped


def test_more_predicates() -> None:
    assert IsTupleLiteralNode(expression("a, b"))
    assert ExpandSeqLiteral(expression("1")) is None
    assert IsGenExpression(expression("(i for i in x)")) is False
    with pytest.raises(TypeError, match="Expected CAtom"):
        IsGenExpression(expression("x"))


def test_texts_of_imports_by_hand() -> None:
    names = parse("import a.b as c, d").GetChild(1)
    assert [(n.module_name, n.as_name) for n in tarvex._ProcessAsNamesList(names)] == [("a.b", "c"), ("d", None)]
    single = tarvex._ProcessSingleModuleNameAs(names.GetChild(0))
    assert (single.module_name, single.as_name) == ("a.b", "c")
    assert tarvex._TextForImportName([names.GetChild(0).GetChild(0)]) == "a.b"
    assert tarvex._GetMatchingChildToken(names, ",") == 1
    assert tarvex._GetMatchingChildToken(names, "nowhere") == -1


def test_instance_names_are_built_from_the_vocabulary() -> None:
    for constant, cls_name in {
        "kListInstanceName": "list",
        "kDictInstanceName": "dict",
        "kSetInstanceName": "set",
        "kTupleInstanceName": "tuple",
        "kStringInstanceName": "str",
        "kUnicodeInstanceName": "unicode",
        "kBytesInstanceName": "bytes",
        "kIntLiteralName": "int",
        "kFloatLiteralName": "float",
    }.items():
        expected = kTypedLiteralPrefix + GetInstanceNameForClass(cls_name).encode()
        assert getattr(tarvex, constant) == expected == tarvex._GetBuiltinInstanceName(cls_name)
