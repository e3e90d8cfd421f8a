"""Small helpers of the tests of the engine: lines and trees out of source text."""

from __future__ import annotations

from functools import cache

from quillet.logicalline import CLogicalLine, GetLogicalsFromText
from quillet.tarvex import CNode, CPGenAnalyzerImpl, CPGenParserImpl, kPy2DefaultGrammar

PY2_KEYWORDS = (
    "and as assert break class continue def del elif else except exec finally for from global if import in is lambda "
    "not or pass print raise return try while with yield"
).split()


@cache
def analyzer(version: tuple[int, ...] = (3, 8, 0)) -> CPGenAnalyzerImpl:
    if version < (3, 0):
        return CPGenAnalyzerImpl(version, kPy2DefaultGrammar, PY2_KEYWORDS, False)
    return CPGenAnalyzerImpl(version)


@cache
def parser(version: tuple[int, ...] = (3, 8, 0)) -> CPGenParserImpl:
    if version < (3, 0):
        return CPGenParserImpl(version, kPy2DefaultGrammar, PY2_KEYWORDS, False)
    return CPGenParserImpl(version)


def line_of(text: str, version: tuple[int, ...] = (3, 12)) -> CLogicalLine:
    """The one logical line of a text."""
    (line,) = GetLogicalsFromText(text, version)
    return line


def parse(text: str, version: tuple[int, ...] = (3, 8, 0), in_async_def: bool = False) -> CNode | None:
    return parser(version).ParseToNode(line_of(text, version), in_async_def)


def expression(text: str, version: tuple[int, ...] = (3, 8, 0)) -> CNode:
    """The node of an expression that stands alone in a statement."""
    node = parse(text, version)
    assert node is not None
    return node


def nested(depth: int) -> CNode:
    """A leaf name under `depth` - 1 plain nodes."""
    node = expression("x")
    for _ in range(depth - 1):
        outer = CNode()
        outer.fChildren = [node]
        node = outer
    return node


def wide(visits: int) -> CNode:
    """A tree of `visits` nodes."""
    node = CNode()
    leaves = []
    for _ in range(visits - 2):
        leaf = CNode()
        leaf.fText = ","
        leaves.append(leaf)
    node.fChildren = [*leaves, expression("x")]
    return node


def shape(node: CNode | None) -> object:
    """A tree as nested tuples: the text of a leaf, the class name and the children of an inner node."""
    if node is None:
        return None
    if node.fText is not None:
        return node.fText
    return (type(node).__name__, *(shape(child) for child in node.fChildren or ()))


def records(text: str, version: tuple[int, ...] = (3, 8, 0), **where: bool) -> list[tuple[bytes, bytes]]:
    line = line_of(text, version)
    error = analyzer(version).AnalyzeSingleLogical(
        line, where.get("in_async_def", False), where.get("first_in_def", False)
    )
    assert error is None, error
    return (line.fTypeEquivs or []) + (line.fArgTypeEquivs or [])
