"""The value of a string literal, of either language, by the host's own decoders.

The host decodes escapes, but not every literal as it stands: it warns of escapes that it does not know,
which other people's source is full of, it refuses bytes beyond ASCII, which Python 2 allows, and it does
not know Python 2's `ur`. So escapes that mean nothing have their backslash doubled, and the host decodes
the rest.
"""

from __future__ import annotations

import re

from quillet._fastaccess import GetTokenType, kTokenId_STRING

_PREFIXES = frozenset(("", "r", "u", "b", "ur", "br", "rb"))
_PARTS = re.compile(r"""([a-zA-Z]*)('''|\"\"\"|'|")(.*)\2""", re.DOTALL)
_LINE_END = re.compile(r"\r\n?")
# A backslash with what it means something in front of, or alone.
_BYTES_ESCAPE = re.compile(r"\\(?:[\n\\'\"abfnrtvx]|([0-7]{1,3}))?")
_TEXT_ESCAPE = re.compile(r"\\(?:[\n\\'\"abfnrtvxNuU]|([0-7]{1,3}))?")
_ESCAPE_IN_RAW = re.compile(r"(\\+)[uU]((?<=u)[0-9a-fA-F]{4}|(?<=U)[0-9a-fA-F]{8})")


def ObjectForStringLiteral(text: str) -> str | bytes:
    """The value of one string literal: bytes with a "b" in its prefix, otherwise str.

    ValueError for what is no string literal or has no constant value (an f-string), and whatever the
    host's decoder raises for a broken escape.
    """
    parts = _PARTS.fullmatch(text) if GetTokenType(text) == kTokenId_STRING else None
    if parts is None or (prefix := parts[1].lower()) not in _PREFIXES:
        raise ValueError(f"not a constant string literal: {text!r}")
    body = _LINE_END.sub("\n", parts[3])
    if "b" in prefix:
        encoded = body.encode("utf-8", "surrogateescape")
        if "r" in prefix:
            return encoded
        # A byte is a character below 256 while escapes are decoded.
        return _decoded(encoded.decode("latin-1"), _BYTES_ESCAPE, 0xFF).encode("latin-1")
    if "r" not in prefix:
        return _decoded(body, _TEXT_ESCAPE, 0x1FF)
    return _ESCAPE_IN_RAW.sub(_decoded_in_raw, body) if "u" in prefix else body


def _decoded(body: str, escapes: re.Pattern[str], octal_mask: int) -> str:
    def respell(escape: re.Match[str]) -> str:
        if escape[1]:  # three octal digits go up to 511, which the host warns of
            return f"\\u{int(escape[1], 8) & octal_mask:04x}"
        return escape[0] if len(escape[0]) > 1 else r"\\"

    # The decoder takes ASCII; all else goes in as escapes of its own.
    return escapes.sub(respell, body).encode("ascii", "backslashreplace").decode("unicode_escape")


def _decoded_in_raw(escape: re.Match[str]) -> str:
    slashes, digits = escape.groups()
    if len(slashes) % 2 == 0:
        return escape[0]
    return slashes[1:] + chr(int(digits, 16))
