"""Source in any form that Python accepts, as the UTF-8 bytes that the core reads.

A byte order mark or the encoding line of PEP 263 says how bytes are to be read; without either they
are UTF-8 and pass as they are, valid or not, since the tokeniser marks what it cannot read. The trap:
an encoding line counts on the second line only where the first holds nothing but a comment.
"""

from __future__ import annotations

import re

_BOM = b"\xef\xbb\xbf"
_WIDE_MARKS = (
    (b"\xff\xfe\0\0", "utf-32"),
    (b"\0\0\xfe\xff", "utf-32"),
    (b"\xff\xfe", "utf-16"),
    (b"\xfe\xff", "utf-16"),
)
_COOKIE = re.compile(rb"[ \t\f]*#[^\r\n]*?coding[:=][ \t]*([-\w.]+)")
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
        text = source.decode(re.sub(r"-(?:unix|dos|mac)$", "", name), "replace")
    except (LookupError, UnicodeError) as error:
        raise SourceEncodingError(f"cannot read the source as {name!r}: {error}") from error
    return text.encode("utf-8", "surrogatepass")


def _is_utf8(name: str) -> bool:
    normal = name.lower().replace("_", "-")
    return normal in ("utf8", "u8") or normal == "utf-8" or normal.startswith("utf-8-")
