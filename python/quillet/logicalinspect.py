"""Questions about logical lines."""

from __future__ import annotations

from collections.abc import Sequence
from typing import Protocol

from quillet.logicalline import CLogicalLine
from quillet.tarvex._siblings.logicalinspect import _TextFromLine, _TextFromToks

__all__ = ["TextFromTokens"]


class _HasTokens(Protocol):
    fToks: Sequence[str | None]
    fPositions: Sequence[tuple[int, int]]


def TextFromTokens(logical: _HasTokens) -> str:
    """The source text of a line, as its tokens and positions spell it.

    `logical` is a CLogicalLine or any object with `fToks` and `fPositions`. Removed tokens leave blanks.
    """
    if isinstance(logical, CLogicalLine):
        return _TextFromLine(logical)
    return _TextFromToks(logical.fToks, logical.fPositions)
