"""A statement's parse tree as indented text, one node a line.

An inner node is its class and the grammar's name for it, a leaf its class and its text. A rule that
matched a single child is no node: the child stands in its place.
"""

from __future__ import annotations

from collections.abc import Iterator

from quillet.host import Line
from quillet.optpgen import ParseError
from quillet.tarvex import CNode, CPGenAnalyzerImpl, CreateSyntaxError, FinishedWithNode


def tree_text(line: Line, analyzer: CPGenAnalyzerImpl) -> str:
    """The tree of a line by an analyzer, each line of text ended by a newline; "" for one without tokens to parse.

    Raises SyntaxError for a line that does not parse.
    """
    if line.logical.fType in ("comment", "blank line"):
        return ""
    try:
        node = analyzer.ParseToNode(line.logical, line.in_async_def)
    except ParseError as error:
        raise CreateSyntaxError("invalid syntax", line.logical, error.context) from None
    if node is None:
        return ""
    try:
        return "".join(f"{'  ' * depth}{_node_text(inner)}\n" for depth, inner in _preorder(node))
    finally:
        FinishedWithNode(node)


def _node_text(node: CNode) -> str:
    name = type(node).__name__
    return f"{name} {node.GetStateName()}" if node.fText is None else f"{name} {node.fText!r}"


def _preorder(node: CNode) -> Iterator[tuple[int, CNode]]:
    pending = [(0, node)]
    while pending:
        depth, node = pending.pop()
        yield depth, node
        pending.extend((depth + 1, child) for child in reversed(node.fChildren or ()))
