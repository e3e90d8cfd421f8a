"""The body of a file's page: each line with its names as links, hints on hover, and its errors below it.

Names of one place share their start (`self` and `self.price`): the first link is the shortest name, each
longer one continues behind it. A name that does not stand in the line as it was recorded, because the
file changed or the name spans lines, gets no link. Everything is worked out in UTF-8 bytes, in which
columns count, and decoded piece by piece.
"""

from __future__ import annotations

import keyword
import re
from collections.abc import Callable, Iterator
from html import escape
from typing import NamedTuple

_NAME = re.compile(r"[^\W\d]\w*(?:\.[^\W\d]\w*)*")
# Whatever begins ends at the latest with the source, so that no end is looked for twice.
_COLOURED = re.compile(
    rb"(?P<s>[rbufRBUF]{0,2}(?:"
    rb'"""(?:[^"\\]|\\.|"(?!""))*(?:"""|\\?\Z)'
    rb"|'''(?:[^'\\]|\\.|'(?!''))*(?:'''|\\?\Z)"
    rb'|"(?:[^"\\\n]|\\.)*"?'
    rb"|'(?:[^'\\\n]|\\.)*'?))"
    rb"|(?P<c>#[^\n]*)"
    rb"|(?P<w>[A-Za-z_\x80-\xff][\w\x80-\xff]*)"
    rb"|(?P<d>[0-9][\w.]*)",
    re.DOTALL,
)
_KEYWORDS = frozenset(word.encode() for word in keyword.kwlist)
_CONTROL = {code: chr(0x2400 + code) for code in range(32) if code != 9} | {127: "␡"}
_CONTROL |= {code: f"\\u{code:04x}" for code in (*range(0x202A, 0x202F), *range(0x2066, 0x206A), 0x2028, 0x2029)}


class Link(NamedTuple):
    """A name at a place of a line, in bytes from 0, and the attributes of its link."""

    start: int
    end: int
    attributes: str


def is_name(text: str) -> bool:
    """Whether a recorded name is plain or dotted, and so may be a link."""
    return _NAME.fullmatch(text) is not None


def shown(text: str) -> str:
    """Text for a page: escaped, with pictures of control characters in their place."""
    return escape(text.translate(_CONTROL))


def rows(
    lines: list[bytes], links_of: Callable[[int], list[Link]], errors: dict[int, list[tuple[int, str]]]
) -> Iterator[str]:
    """The lines as HTML."""
    colours = _colours(lines)
    for number, line in enumerate(lines, 1):
        content = "".join(_pieces(line, links_of(number), colours.get(number, [])))
        bad = ' class="bad"' if number in errors else ""
        yield f'<div id="L{number}"{bad}><a class="no" href="#L{number}">{number}</a><code>{content}</code></div>\n'
        for column, message in errors.get(number, ()):
            before = line[: column - 1].decode("utf-8", "replace")
            blanks = "".join("\t" if char == "\t" else " " for char in before)
            yield f'<div class="error"><code>{blanks}^ {shown(message)}</code></div>\n'


def _colours(lines: list[bytes]) -> dict[int, list[tuple[int, int, str]]]:
    """Strings, comments, keywords and numbers of each line as (start, end, class)."""
    found: dict[int, list[tuple[int, int, str]]] = {}
    source = b"\n".join(lines)
    number, line_start = 1, 0
    for match in _COLOURED.finditer(source):
        kind = match.lastgroup or ""
        if kind == "w":
            if match[0] not in _KEYWORDS:
                continue
            kind = "k"
        start, end = match.span()
        skipped = source.count(b"\n", line_start, start)
        if skipped:
            number += skipped
            line_start = source.rindex(b"\n", line_start, start) + 1
        while True:
            line_end = line_start + len(lines[number - 1])
            found.setdefault(number, []).append((start - line_start, min(end, line_end) - line_start, kind))
            if end <= line_end:
                break
            number += 1
            start = line_start = line_end + 1
    return found


def _pieces(line: bytes, links: list[Link], colours: list[tuple[int, int, str]]) -> Iterator[str]:
    at = 0
    for start, end, attributes in links:
        yield from _coloured(line, at, start, colours)
        yield f"<a {attributes}>{_text(line[start:end])}</a>"
        at = end
    yield from _coloured(line, at, len(line), colours)


def _coloured(line: bytes, at: int, stop: int, colours: list[tuple[int, int, str]]) -> Iterator[str]:
    for start, end, kind in colours:
        if end <= at:
            continue
        if start >= stop:
            break
        start, end = max(start, at), min(end, stop)
        yield _text(line[at:start])
        yield f'<b class="{kind}">{_text(line[start:end])}</b>'
        at = end
    yield _text(line[at:stop])


def _text(data: bytes) -> str:
    return shown(data.decode("utf-8", "replace"))


def place_links(line: bytes, names: list[tuple[int, str, str]]) -> list[Link]:
    """The links of a line out of (column from 1, name, attributes), without overlap, in order."""
    links: list[Link] = []
    at = 0
    for column, name, attributes in sorted(names, key=lambda item: (item[0], len(item[1]))):
        start = column - 1
        text = name.encode("utf-8", "surrogatepass")
        end = start + len(text)
        if line[start:end] != text or end <= at:
            continue
        links.append(Link(max(start, at), end, attributes))
        at = end
    return links
