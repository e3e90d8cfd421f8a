"""How the command line writes: safe text, colours, and a source line with a caret under a column.

Source text and file names come from anywhere, so control characters are shown as escapes and never
reach a terminal. Columns count UTF-8 bytes from 1, as everywhere in the data; the caret is set by the
width that the text in front of it has on a terminal.
"""

from __future__ import annotations

import os
import sys

TYPE_CHECKING = False
if TYPE_CHECKING:
    from quillet.host import Analysis, Line

# Everything that moves a terminal's cursor, changes its state or reverses its text; tabs are kept.
_UNSAFE = r"[\x00-\x08\x0a-\x1f\x7f-\x9f\u061c\u200e\u200f\u2028\u2029\u202a-\u202e\u2066-\u2069\ud800-\udfff]"
# How much of a long line is shown, in characters: the error stands within it.
_WINDOW = 160


def printable(text: str) -> str:
    """`text` with control characters as escapes; one line, safe to show."""
    if text.isprintable():
        return text
    import re

    return re.sub(_UNSAFE, lambda match: match[0].encode("unicode_escape", "surrogatepass").decode("ascii"), text)


class Style:
    """Colours, or none where the stream is no terminal or NO_COLOR is set."""

    def __init__(self, on: bool) -> None:
        self.on = on

    @classmethod
    def of_stdout(cls) -> Style:
        wanted = not os.environ.get("NO_COLOR") and os.environ.get("TERM") != "dumb"
        return cls(wanted and sys.stdout.isatty())

    def _wrap(self, code: str, text: str) -> str:
        return f"\x1b[{code}m{text}\x1b[0m" if self.on and text else text

    def place(self, text: str) -> str:
        return self._wrap("36", text)

    def name(self, text: str) -> str:
        return self._wrap("1", text)

    def error(self, text: str) -> str:
        return self._wrap("1;31", text)


def width(text: str) -> int:
    """The cells that `text` takes on a terminal; it holds no tab."""
    import unicodedata

    cells = 0
    for char in text:
        if char.isascii():
            cells += 1
        elif unicodedata.category(char) not in ("Mn", "Me", "Cf"):
            cells += 2 if unicodedata.east_asian_width(char) in "WF" else 1
    return cells


def source_and_caret(line: bytes, column: int) -> tuple[str, str]:
    """A source line and the line under it with a caret at `column` (UTF-8 bytes, from 1).

    A column past the end points behind the last character. Tabs stand in both lines, so that they
    align whatever a tab's width; of a very long line the part around the column is shown.
    """
    before = line[: max(column - 1, 0)].decode("utf-8", "replace")
    after = line[max(column - 1, 0) :].decode("utf-8", "replace")
    if len(before) + len(after) > _WINDOW:
        if len(before) > _WINDOW // 2:
            before = "…" + before[-(_WINDOW // 2) :]
        if len(after) > _WINDOW // 2:
            after = after[: _WINDOW // 2] + "…"
    before = printable(before)
    blanks = "".join("\t" if char == "\t" else " " * width(char) for char in before)
    return before + printable(after), blanks + "^"


def error_text(path: str, analysis: Analysis, row: int, column: int, message: str, style: Style) -> str:
    """A syntax error as `path:row:column: message`, with the source line and a caret under it."""
    source, caret = source_and_caret(analysis.source_line(row), column)
    place = style.place(f"{printable(path)}:{row}:{column}:")
    return f"{place} {style.error(printable(message))}\n    {source}\n    {style.error(caret)}\n"


def statement_text(path: str, analysis: Analysis, line: Line, style: Style) -> str:
    """`path:line: statement`, the statement by its first physical line."""
    source = printable(analysis.source_line(line.first_line).decode("utf-8", "replace").strip())
    if len(source) > _WINDOW:
        source = source[: _WINDOW - 1] + "…"
    more = " …" if line.last_line > line.first_line else ""
    return f"{style.place(f'{printable(path)}:{line.first_line}:')} {source}{more}\n"


def place_text(path: str, line: int, column: int, source: bytes, style: Style) -> str:
    """`path:line:column: source line`, as compilers write it."""
    text = printable(source.decode("utf-8", "replace").strip())
    if len(text) > _WINDOW:
        text = text[: _WINDOW - 1] + "…"
    place = style.place(f"{printable(path)}:{line}:{column}:")
    return f"{place} {text}".rstrip()
