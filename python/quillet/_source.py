"""Source in any form that Python accepts, as the UTF-8 bytes that the core reads.

A byte order mark or the encoding line of PEP 263 says how bytes are to be read; without either they
are UTF-8 and pass as they are, valid or not, since the tokeniser marks what it cannot read. The trap:
an encoding line counts on the second line only where the first holds nothing but a comment.
"""

from __future__ import annotations

import codecs
import re

_BOM = b"\xef\xbb\xbf"
_WIDE_MARKS = (
    (b"\xff\xfe\0\0", "utf-32"),
    (b"\0\0\xfe\xff", "utf-32"),
    (b"\xff\xfe", "utf-16"),
    (b"\xfe\xff", "utf-16"),
)
_COOKIE = re.compile(rb"[ \t\f]*#[^\r\n]*?coding[:=][ \t]*([-\w.]+)")
# An escape of three octal digits that is no byte, and a backslash that escapes nothing.
_ODD_ESCAPE = re.compile(rb"""\\(?:([4-7][0-7]{2})|([^\n\\'"abfnrtvxuUN0-7])|.)""", re.DOTALL)
_LONGEST_SHOWN = 120
_COMMENT_OR_BLANK = re.compile(rb"[ \t\f]*(?:#[^\r\n]*)?(?:\r\n|\r|\n)")


class SourceEncodingError(ValueError):
    """The encoding that a source names for itself is unknown, or cannot be used to read a file."""


def named_encoding(source: bytes) -> str | None:
    """The encoding that `source` names in one of its first two lines, as it is spelt there."""
    match = _COOKIE.match(source)
    if match is None:
        first = _COMMENT_OR_BLANK.match(source)
        match = _COOKIE.match(source, first.end()) if first else None
    return match[1].decode("ascii", "replace") if match else None


def to_utf8(source: bytes | bytearray | memoryview | str) -> bytes:
    """The UTF-8 bytes to analyse.

    Text is encoded whatever it says of its own encoding; a lone surrogate becomes invalid UTF-8. Bytes
    with a byte order mark are UTF-8 and keep the mark, which no column counts. What an encoding other
    than UTF-8 cannot read becomes U+FFFD.

    Raises `SourceEncodingError` for an encoding that is unknown or no text encoding, and `TypeError`
    for anything that is neither text nor bytes.
    """
    if isinstance(source, str):
        return source.encode("utf-8", "surrogatepass")
    if isinstance(source, (bytearray, memoryview)):
        source = bytes(source)
    if not isinstance(source, bytes):
        raise TypeError(f"source must be bytes or str, not {type(source).__name__}")
    if source.startswith(_BOM):
        return source
    for mark, encoding in _WIDE_MARKS:
        if source.startswith(mark):
            return source.decode(encoding, "replace").encode("utf-8", "surrogatepass")
    name = named_encoding(source)
    if name is None or _is_utf8(name):
        return source
    try:
        # Some editors append the kind of line end to the name.
        text = _decode(source, re.sub(r"-(?:unix|dos|mac)$", "", name))
    except Exception as error:  # whatever a codec raises
        raise SourceEncodingError(f"cannot read the source as {_short(repr(name))}: {_reason(error)}") from error
    return text.encode("utf-8", "surrogatepass")


def _decode(source: bytes, encoding: str) -> str:
    if getattr(codecs.lookup(encoding), "name", None) == "unicode-escape":
        # Its decoder warns of these, and reads them as what they are replaced by here.
        source = _ODD_ESCAPE.sub(_plain_escape, source)
    return source.decode(encoding, "replace")


def _plain_escape(match: re.Match[bytes]) -> bytes:
    if match[1]:
        return b"\\u%04x" % int(match[1], 8)
    return b"\\" + match[0] if match[2] else match[0]


def _reason(error: Exception) -> str:
    """An exception in one line of moderate length."""
    text = "".join(str(error).splitlines()[:1])
    if not isinstance(error, (LookupError, UnicodeError)):
        text = f"{type(error).__name__}: {text}".rstrip(": ")
    return _short(text)


def _short(text: str) -> str:
    return text if len(text) <= _LONGEST_SHOWN else text[:_LONGEST_SHOWN] + "\N{HORIZONTAL ELLIPSIS}"


def _is_utf8(name: str) -> bool:
    normal = name.lower().replace("_", "-")
    return normal in ("utf8", "u8") or normal == "utf-8" or normal.startswith("utf-8-")
