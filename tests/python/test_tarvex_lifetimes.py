"""Wrappers of nodes held, dropped, changed and looked at in any order: no crash, whatever a host does.

What a host may hold past a tree's discard shows some content or an error of its own, and nothing here asks
which; under a sanitizer the same steps show that no freed memory is read.
"""

from __future__ import annotations

import contextlib
import gc
import random
from typing import Any

import pytest

from lines import line_of, shape
from quillet.tarvex import (
    CNode,
    CNodeToTextConverterImpl,
    CNodeWalker,
    CPGenAnalyzerImpl,
    FinishedWithNode,
    GetTokenEndIndex,
)

STATEMENTS = [
    "x = y",
    "def f(a, *b, c: int = 3, **d) -> str:",
    "for a, (b, c) in [1, 2, {3: 4}]:",
    "f(a.b[c], *d, e=lambda q: q + 1)[0].g",
    "with open(a) as b, c as d:",
    "case {'k': [a, *b], **rest} if x:",
    "def f[T: int, *Ts](x): ".strip(),
    "x = [a for b in c if d]  # type: List[int]",
    "import a.b as c, d",
    "x = (",
    "((((((((((a))))))))))",
    "x = = 1",
    "yield from (await b)",
    "@a.b(c)",
]


class Steps:
    def __init__(self, seed: int) -> None:
        self.random = random.Random(seed)
        self.analyzer = CPGenAnalyzerImpl((3, 12))
        self.roots: list[CNode] = []
        self.held: list[Any] = []

    def line(self) -> Any:
        return line_of(self.random.choice(STATEMENTS).replace("x", f"name_{self.random.randrange(1000)}"))

    def parse(self) -> None:
        try:
            node = self.analyzer.ParseToNode(self.line(), True)
        except Exception:
            return
        if node is not None:
            self.roots.append(node)

    def analyze(self) -> None:
        self.analyzer.AnalyzeSingleLogical(self.line(), True)

    def hint(self) -> None:
        walker = self.analyzer._fTypeHintWalker
        walker._fLogical = self.line()
        try:
            self.held.append(walker._ParseHint(self.random.choice(["List[int]", "int, str", "a."]), 0, False))
        except SyntaxError:
            pass
        finally:
            walker._fLogical = None

    def node(self) -> CNode | None:
        node: Any = self.random.choice(self.roots) if self.roots else None
        while node is not None and node.fChildren and self.random.random() < 0.7:
            node = self.random.choice(node.fChildren)
        return node

    def hold(self) -> None:
        node = self.node()
        if node is not None:
            self.held.append(self.random.choice([node, node.fChildren, node.fClsInfo]))

    def discard(self) -> None:
        if self.roots:
            root = self.roots.pop(self.random.randrange(len(self.roots)))
            FinishedWithNode(root)
            if self.random.random() < 0.3:
                self.held.append(root)

    def lose(self) -> None:
        if self.roots:
            self.roots.pop()

    def change(self) -> None:
        node, other = self.node(), self.node()
        if node is None or other is None or not node.fChildren:
            return
        if self.random.random() < 0.5:
            made = CNode()
            made.fText = "made"
            node.fChildren.append(made)
        else:
            node.GetChild(0).fText = "other"

    def look(self) -> None:
        node = self.node()
        if node is not None:
            shape(node)
            for question in (CNodeToTextConverterImpl(True, True, True).TextForNode, GetTokenEndIndex):
                with contextlib.suppress(TypeError, ValueError, IndexError, AttributeError, RecursionError):
                    question(node)
            line = self.line()
            with contextlib.suppress(SyntaxError, ValueError, TypeError, IndexError, AttributeError, AssertionError):
                CNodeWalker((3, 12)).Walk(node, line)
            repr(line.fTypeEquivs)

    def look_at_held(self) -> None:
        for held in self.held[-5:]:
            for node in held if isinstance(held, list) else [held]:
                if isinstance(node, CNode):
                    repr((node.fText, node.fContext, node.GetChildCount(), node.GetStateName(), node.fNextFree))
                elif node is not None:
                    repr((node.fName, node.fFirstFree))

    def drop(self) -> None:
        del self.held[: self.random.randrange(len(self.held) + 1)]
        if self.random.random() < 0.2:
            gc.collect()

    def run(self, count: int) -> None:
        steps = [self.parse, self.analyze, self.hold, self.discard, self.change, self.look, self.look_at_held]
        steps += [self.parse, self.analyze, self.hint, self.drop, self.lose]
        for _ in range(count):
            self.random.choice(steps)()


@pytest.mark.parametrize("seed", range(8))
def test_any_order_of_steps_is_safe(seed: int) -> None:
    steps = Steps(seed)
    steps.run(400)
    assert steps.analyzer.AnalyzeSingleLogical(line_of("x = y"), False) is None
