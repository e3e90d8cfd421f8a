"""Why a statement that Python accepts is a syntax error here, shown by repairing it.

Each kind of rejection knows the smallest edit that turns its form into one that is read. A statement is of
that kind if its error goes away by the edit, and nothing else is wrong with it if no error is left in the
end: so a rejection that is no known kind stays without an explanation, whatever it looks like.
"""

from __future__ import annotations

import ast
import keyword
import re
from collections.abc import Callable
from typing import NamedTuple

from quillet import Analysis, Line
from quillet.logicalline import CLogicalLine, GetLogicalsFromText

Edit = tuple[int, int, str]  # replaces the bytes from the first to the second index

_NAME = re.compile(r"[^\W\d]\w*$")
_STRING = re.compile(r"[A-Za-z]{0,3}['\"]")
_OPENING, _CLOSING = "([{", ")]}"
_MOST_REPAIRS = 100


class Statement:
    """One rejected statement: its significant tokens and the place of its error.

    `words` are the tokens but comments and backslashes, `spans` their bytes in `text`, `depths` the number
    of brackets that are open in front of them. `at` is the word at which the error lies, `len(words)` behind
    the last one; `comment` the span of the comment in which it lies, or None.
    """

    def __init__(self, logical: CLogicalLine, error: SyntaxError, text: str, version: tuple[int, int]) -> None:
        self.message = error.msg
        self.version = version
        starts = [0]
        source = text.encode("utf-8", "surrogateescape")
        starts += [match.end() for match in re.finditer(rb"\r\n|\r|\n", source)]
        first = logical.fPositions[0]
        begin = starts[first[0]] + first[1]
        place = starts[(error.lineno or 1) - 1] + (error.offset or 1) - 1 - begin
        last_end = 0
        self.words: list[str] = []
        self.spans: list[tuple[int, int]] = []
        self.depths: list[int] = []
        self.at = 0
        self.comment: tuple[int, int] | None = None
        depth = 0
        for token, (line, column) in zip(logical.fToks, logical.fPositions, strict=True):
            if token is None:
                continue
            start = starts[line] + column - begin
            last_end = start + len(token.encode("utf-8", "surrogateescape"))
            if token[0] in "#\\":
                if start <= place < last_end:
                    self.comment = (start, last_end)
                continue
            self.words.append(token)
            self.spans.append((start, last_end))
            self.depths.append(depth)
            if start <= place:
                self.at = len(self.words) - (1 if place < last_end else 0)
            depth += (token in _OPENING) - (token in _CLOSING)
        self.source = source[begin : begin + last_end]

    @property
    def first(self) -> str:
        """The first word."""
        return self.words[0] if self.words else ""

    def word(self, index: int) -> str:
        """A word, and "" behind the last one."""
        return self.words[index] if 0 <= index < len(self.words) else ""

    def closing(self, index: int) -> int:
        """The bracket that closes the one at `index`, or `len(words)`."""
        depth = self.depths[index]
        behind = range(index + 1, len(self.words))
        return next((i for i in behind if self.words[i] in _CLOSING and self.depths[i] == depth + 1), len(self.words))

    def find(self, text: str, start: int, end: int, depth: int) -> int:
        """The first such word at a depth, or -1."""
        found = (
            i for i in range(start, min(end, len(self.words))) if self.depths[i] == depth and self.words[i] == text
        )
        return next(found, -1)

    def head_end(self) -> int:
        """The word that ends the pattern of a `case`: its "if" or its ":"."""
        ends = (self.find(word, 1, len(self.words), 0) for word in ("if", ":"))
        return min((end for end in ends if end >= 0), default=len(self.words))

    def wrap(self, first: int, end: int, opening: str, closing: str) -> list[Edit]:
        """The edits that put brackets around the words from `first` up to `end`."""
        start, stop = self.spans[first][0], self.spans[end - 1][1]
        return [(start, start, opening), (stop, stop, closing)]

    def delete(self, first: int, end: int) -> list[Edit]:
        """The edit that takes the words from `first` up to `end` away."""
        return [(self.spans[first][0], self.spans[end - 1][1], " ")]

    def replace(self, index: int, text: str) -> Edit:
        """The edit that replaces a word."""
        return (*self.spans[index], text)

    def edited(self, edits: list[Edit]) -> str:
        """The text with edits made."""
        out, at = b"", 0
        for start, end, text in sorted(edits, key=lambda edit: edit[:2]):
            out += self.source[at:start] + text.encode()
            at = end
        return (out + self.source[at:]).decode("utf-8", "surrogateescape")


def _is_name(word: str) -> bool:
    return _NAME.match(word) is not None and not keyword.iskeyword(word)


def _parses(text: str, mode: str) -> bool:
    try:
        ast.parse(text.strip(), mode=mode)
    except (SyntaxError, ValueError):
        return False
    return True


# ---- the repairs: the edits for a statement of the kind, an empty list for any other ----


def _pair_in_except(s: Statement) -> list[Edit]:
    comma = s.find(",", 1, len(s.words), 0)
    if s.version >= (3, 0) or s.first != "except" or comma < 0 or s.word(comma + 1) not in ("(", "["):
        return []
    close = s.closing(comma + 1)
    return [(s.spans[comma + 1][0], s.spans[close][1], "e")] if close < len(s.words) else []


def _open_sequence(s: Statement) -> list[Edit]:
    end = s.head_end()
    return s.wrap(1, end, "[", "]") if s.first == "case" and s.find(",", 1, end, 0) >= 0 else []


def _group(s: Statement) -> list[Edit]:
    if s.first != "case":
        return []
    edits: list[Edit] = []
    for i in range(1, s.head_end()):
        is_call = i > 1 and _NAME.match(s.words[i - 1]) is not None
        close = s.closing(i) if s.words[i] == "(" and not is_call else len(s.words)
        if close < len(s.words) and s.find(",", i + 1, close, s.depths[i] + 1) < 0:
            edits += [s.replace(i, "["), s.replace(close, "]")]
    return edits


def _joined_strings(s: Statement) -> list[Edit]:
    if s.first != "case":
        return []
    pairs = (i for i in range(2, s.head_end()) if _STRING.match(s.words[i - 1]) and _STRING.match(s.words[i]))
    second = next(pairs, None)
    return s.delete(second, second + 1) if second is not None else []


def _decorator(s: Statement) -> list[Edit]:
    if s.first != "@" or len(s.words) < 2:
        return []
    end = 1
    while _is_name(s.word(end)):
        end += 1
        if s.word(end) != ".":
            break
        end += 1
    if end > 1 and s.word(end) == "(":
        end = s.closing(end) + 1
    return s.wrap(1, len(s.words), "f(", ")") if end < len(s.words) else []


def _starred_annotation(s: Statement) -> list[Edit]:
    is_kind = s.word(s.at) == "*" and s.word(s.at - 1) == ":" and s.word(s.at - 3) == "*"
    return s.delete(s.at, s.at + 1) if is_kind else []


def _type_parameter_default(s: Statement) -> list[Edit]:
    head = 1 if s.first == "async" else 0
    if s.word(head) not in ("def", "class", "type") or s.word(head + 2) != "[" or s.word(s.at) != "=":
        return []
    close = s.closing(head + 2)
    if not head + 2 < s.at < close or s.depths[s.at] != 1:
        return []
    comma = s.find(",", s.at, close, 1)
    return s.delete(s.at, comma if comma >= 0 else close)


def _with_bracket(s: Statement) -> list[Edit]:
    if s.first != "with" or s.word(1) != "(":
        return []
    close = s.closing(1)
    if close >= len(s.words) or (s.word(2) == "(" and s.closing(2) == close - 1):
        return []
    inside = [i for i in range(2, close) if s.depths[i] == 1]
    starred = any(s.words[i] == "*" and s.words[i - 1] in "(," for i in inside)
    if inside and not starred and not {s.words[i] for i in inside} & {":=", "yield", "for"}:
        return []
    return s.wrap(1, close + 1, "(", ")")


def _async_with_bracket(s: Statement) -> list[Edit]:
    if s.words[:3] != ["async", "with", "("]:
        return []
    close = s.closing(2)
    if close >= len(s.words) or s.find("as", 3, close, 1) < 0:
        return []
    last = close - 1 if s.words[close - 1] == "," else close
    return s.delete(2, 3) + s.delete(last, close + 1)


def _exceptions_without_brackets(s: Statement) -> list[Edit]:
    first = 2 if s.word(1) == "*" else 1
    end = s.find(":", 1, len(s.words), 0)
    is_kind = s.version >= (3, 14) and s.first == "except" and s.find(",", 1, end, 0) > 0
    return s.wrap(first, end, "(", ")") if is_kind else []


def _template_string(s: Statement) -> list[Edit]:
    for i in range(1, len(s.words)):
        is_prefix = s.words[i - 1].lower() in ("t", "tr", "rt") and s.spans[i - 1][1] == s.spans[i][0]
        if s.version >= (3, 14) and is_prefix and _STRING.match(s.words[i]):
            return s.delete(i - 1, i)
    return []


def _text_of_hint(s: Statement) -> str:
    try:
        value = ast.literal_eval(s.word(s.at))
    except (SyntaxError, ValueError):
        return ""
    return value if isinstance(value, str) else ""


def _text_in_annotation(s: Statement) -> list[Edit]:
    is_kind = "stringified" in s.message and _STRING.match(s.word(s.at)) and not _parses(_text_of_hint(s), "eval")
    return [s.replace(s.at, "int")] if is_kind else []


def _comment_text(s: Statement) -> str:
    if s.comment is None:
        return ""
    comment = s.source[s.comment[0] : s.comment[1]].decode("utf-8", "surrogateescape")
    return comment.partition("type:")[2].partition("#")[0]


def _is_signature_comment(s: Statement) -> bool:
    return s.comment is not None and (not s.words or "def" in s.words[:2])


def _comment_that_is_no_signature(s: Statement) -> list[Edit]:
    is_kind = _is_signature_comment(s) and not _parses(_comment_text(s), "func_type")
    return [(*s.comment, " ")] if is_kind and s.comment else []


def _star_in_signature_comment(s: Statement) -> list[Edit]:
    is_kind = _is_signature_comment(s) and "*" in _comment_text(s)
    return [(*s.comment, " ")] if is_kind and s.comment else []


def _brackets_in_signature_comment(s: Statement) -> list[Edit]:
    is_kind = _is_signature_comment(s) and _comment_text(s).count("(") > 1
    return [(*s.comment, " ")] if is_kind and s.comment else []


def _comment_that_is_no_expression(s: Statement) -> list[Edit]:
    is_kind = s.comment and not _is_signature_comment(s) and not _parses(_comment_text(s), "eval")
    return [(*s.comment, " ")] if is_kind and s.comment else []


class Kind(NamedTuple):
    """A form of statement that Python accepts and that is rejected on purpose."""

    title: str
    repair: Callable[[Statement], list[Edit]]


KINDS = (
    Kind("sequence pattern without brackets", _open_sequence),
    Kind("pattern in round brackets, or `()`", _group),
    Kind("strings side by side in a pattern", _joined_strings),
    Kind("`with` around what cannot stand without its brackets", _with_bracket),
    Kind("`async with` with its items in brackets", _async_with_bracket),
    Kind("decorator that is no dotted name with one call", _decorator),
    Kind("starred annotation of `*args`", _starred_annotation),
    Kind("default of a type parameter", _type_parameter_default),
    Kind("exceptions without brackets (3.14)", _exceptions_without_brackets),
    Kind("template string (3.14)", _template_string),
    Kind("several names in `except E, (a, b)` (2.7)", _pair_in_except),
    Kind("string in an annotation that is no expression", _text_in_annotation),
    Kind("type comment behind a `def` that is no signature", _comment_that_is_no_signature),
    Kind("star in a signature comment", _star_in_signature_comment),
    Kind("round brackets inside of a signature comment", _brackets_in_signature_comment),
    Kind("type comment that is no expression", _comment_that_is_no_expression),
)


def explain(analysis: Analysis, line: Line) -> list[str] | None:
    """The titles of the kinds of a rejected line, or None if something in it is rejected for no known reason."""
    text = b"\n".join(analysis.source_line(number) for number in range(line.first_line, line.last_line + 1))
    logical, error = line.logical, line.error
    source = text.decode("utf-8", "surrogateescape")
    kinds: list[str] = []
    while error is not None:
        if len(kinds) == _MOST_REPAIRS or not logical.fToks:
            return None
        statement = Statement(logical, error, source, analysis.version)
        found = ((kind.title, kind.repair(statement)) for kind in KINDS)
        title, edits = next(((title, edits) for title, edits in found if edits), ("", []))
        if not edits:
            return None
        kinds.append(title)
        source = statement.edited(edits)
        lines = GetLogicalsFromText(source, analysis.version)
        if len(lines) != 1:
            return None
        logical = lines[0]
        error = analysis.analyzer.AnalyzeSingleLogical(logical, line.in_async_def, line.first_in_def)
    return list(dict.fromkeys(kinds))
