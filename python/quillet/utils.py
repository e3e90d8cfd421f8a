"""Helpers that the analysis and its hosts share."""

from __future__ import annotations

from quillet import logicalline
from quillet.logicalline import CLogicalLine

__all__ = ["GetLogicalsFromText"]


def GetLogicalsFromText(text: str | bytes, version_triple: tuple[int, ...] | None = None) -> tuple[CLogicalLine, ...]:
    """The logical lines of a text, in order. Without a version the text is read as the running Python's."""
    return logicalline.GetLogicalsFromText(text, version_triple)
