"""Questions about logical lines."""

from __future__ import annotations

from collections.abc import Sequence
from typing import Protocol

from quillet.logicalline import CLogicalLine
from quillet.tarvex import _siblings

__all__ = ["TextFromTokens"]


class _HasTokens(Protocol):
    @property
    def fToks(self) -> Sequence[str | None]: ...

    @property
    def fPositions(self) -> Sequence[tuple[int, int]]: ...


def TextFromTokens(logical: _HasTokens) -> str:
    """The source text of a line, as its tokens and positions spell it.

    `logical` is a CLogicalLine or any object with `fToks` and `fPositions`. Removed tokens leave blanks.
    """
    texts = _siblings.logicalinspect
    if isinstance(logical, CLogicalLine):
        return texts._TextFromLine(logical)
    return texts._TextFromToks(logical.fToks, logical.fPositions)
