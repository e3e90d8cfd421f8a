"""The text of a node in all modes, as a host asks for it."""

from __future__ import annotations

import pytest

from lines import expression
from quillet.tarvex import CNode, CNodeToTextConverter, CNodeToTextConverterImpl, CTrailer, kLiteralNameTexts

PLAIN = CNodeToTextConverterImpl()
ALL = CNodeToTextConverterImpl(True, True, True)
BRACKETS = CNodeToTextConverterImpl(include_bracket_text=True)
STRINGS = CNodeToTextConverterImpl(include_string_contents=True)
ARGS = CNodeToTextConverterImpl(include_arg_text=True)


@pytest.mark.parametrize(
    ("converter", "text", "options", "expected"),
    [
        (PLAIN, "a.b.c", {"dotted_name_only": True}, b"a.b.c"),
        (PLAIN, "a.b()", {"dotted_name_only": True}, None),
        (PLAIN, "a[0]", {"dotted_name_only": True}, None),
        (PLAIN, "1", {"dotted_name_only": True}, None),
        (PLAIN, "(a)", {}, b"a"),
        (PLAIN, "(a)", {"discard_simple_parens": False}, None),
        (PLAIN, "[1, 2]", {}, b"[]"),
        (PLAIN, "{}", {}, b"{}"),
        (PLAIN, "()", {}, None),
        (BRACKETS, "()", {}, b"( )"),
        (STRINGS, '"a" "b"', {}, b'"a"'),
        (PLAIN, '"a" "b"', {}, b"''"),
        (STRINGS, "'a-b'", {}, b"''"),
        (STRINGS, "b'a-b'", {}, b"b''"),
        (STRINGS, "u'a-b'", {}, b"u''"),
        (STRINGS, "'a.b'", {}, b"'a.b'"),
        (PLAIN, "u'x'", {}, b"u''"),
        (PLAIN, "x", {"literal_only": True}, None),
        (PLAIN, "None", {"literal_only": True}, b"None"),
        (PLAIN, "True", {"literal_only": True}, b"True"),
        (PLAIN, "x.y", {"literal_only": True}, None),
        (PLAIN, "None.y", {"literal_only": True}, None),
        (BRACKETS, "a + b", {"add_parens_if_operator": True}, b"(a + b)"),
        (BRACKETS, "a + b", {}, b"a + b"),
        (PLAIN, "a + b", {"add_parens_if_operator": True}, None),
        (PLAIN, "f(x)", {}, b"f()"),
        (PLAIN, "x[1]", {}, b"x[]"),
        (ARGS, "a(b + c)", {}, b"a()"),
        (ALL, "a.b(c)[d]", {}, b"a.b(c)[d]"),
        (ALL, "é.ü", {}, "é.ü".encode()),
        (PLAIN, "(a).b", {}, None),
        (ALL, "x ** 2", {}, b"x"),
    ],
)
def test_texts(
    converter: CNodeToTextConverterImpl, text: str, options: dict[str, bool], expected: bytes | None
) -> None:
    assert converter.TextForNode(expression(text), **options) == expected


def test_options_are_read_by_their_truth_and_kept() -> None:
    one = CNodeToTextConverterImpl(1, 0, "yes")
    assert (one._fIncludeBracketText, one._fIncludeStringContents, one._fIncludeArgText) == (True, False, True)
    assert isinstance(one, CNodeToTextConverter)
    assert CNodeToTextConverter().TextForNode(expression("x")) is None


def test_an_atom_and_its_trailers() -> None:
    node = expression("a.b(c)")
    assert PLAIN.TextForAtomPlusTrailers(node.GetAtom(), node.GetTrailers()) == b"a.b()"
    assert PLAIN.TextForAtomPlusTrailers(node.GetAtom(), node.GetTrailers()[:1], True) == b"a.b"
    assert PLAIN.TextForAtomPlusTrailers(node.GetAtom(), []) == b"a"
    with pytest.raises(TypeError, match="Expected CTrailer, got"):
        PLAIN.TextForAtomPlusTrailers(node.GetAtom(), [node])


def test_failures() -> None:
    bad = CTrailer()
    child = CNode()
    child.fText = "{"
    bad.fChildren = [child]
    with pytest.raises(ValueError, match=r"^Bad trailer node$"):
        PLAIN.TextForAtomPlusTrailers(expression("a"), [bad])
    with pytest.raises(AttributeError):
        PLAIN.TextForNode(None)
    with pytest.raises(TypeError, match="Expected CNode, got str"):
        PLAIN.TextForNode("a")
    with pytest.raises(TypeError, match="Expected CStringLiteral, got"):
        PLAIN._TextForStringLiteral(expression("a"))
    assert STRINGS._TextForStringLiteral(expression("'a'")) == b"'a'"


def test_the_names_that_are_literals() -> None:
    assert type(kLiteralNameTexts) is frozenset
    assert kLiteralNameTexts == {"None", "True", "False"}
    assert all(PLAIN.TextForNode(expression(name), literal_only=True) for name in kLiteralNameTexts)
