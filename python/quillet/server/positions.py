"""Lines and columns as the protocol has them, from 0, and as workspaces do, from 1, in the same units."""

from __future__ import annotations

TYPE_CHECKING = False
if TYPE_CHECKING:
    from typing import Any

    from lsprotocol import types

    from quillet._workspace import Columns

_MOST = 2**31 - 2


def place_of(position: types.Position) -> tuple[int, int]:
    """The line and column of a position."""
    return min(position.line, _MOST) + 1, min(position.character, _MOST) + 1


def range_of(line: int, column: int, end_line: int, end_column: int) -> dict[str, Any]:
    """A range from a place up to another one."""
    return {
        "start": {"line": line - 1, "character": column - 1},
        "end": {"line": end_line - 1, "character": end_column - 1},
    }


def name_range(at: Any) -> dict[str, Any]:
    """The range of what has `line`, `column` and `end_column`."""
    line = at.line - 1
    return {
        "start": {"line": line, "character": at.column - 1},
        "end": {"line": line, "character": at.end_column - 1},
    }


def part_of(line: str, column: int, end_column: int, columns: Columns) -> str:
    """What stands in a line from a column up to another one."""
    if columns == "utf-32" or line.isascii():
        return line[column - 1 : end_column - 1]
    if columns == "utf-8":
        return line.encode("utf-8", "surrogatepass")[column - 1 : end_column - 1].decode("utf-8", "replace")
    units = line.encode("utf-16-le", "surrogatepass")
    return units[2 * (column - 1) : 2 * (end_column - 1)].decode("utf-16-le", "replace")
