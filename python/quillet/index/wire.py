"""Protocol buffers, as far as writing and reading messages of integers, texts and messages goes.

A message is a sequence of fields, each a key (the field's number and how its value is written) and the
value: an integer of 7 bits a byte, or a length and so many bytes.
"""

from __future__ import annotations

from collections.abc import Iterator

_VARINT = 0
_BYTES = 2


def varint(value: int) -> bytes:
    """A non-negative integer, the low 7 bits first, the top bit set where more follow."""
    out = bytearray()
    while value > 0x7F:
        out.append(value & 0x7F | 0x80)
        value >>= 7
    out.append(value)
    return bytes(out)


def integer(number: int, value: int) -> bytes:
    """An integer or enum field; nothing for 0, which is what a reader takes for a missing one."""
    return varint(number << 3 | _VARINT) + varint(value) if value else b""


def data(number: int, value: bytes) -> bytes:
    """A field of bytes, or of a message that is encoded already."""
    return varint(number << 3 | _BYTES) + varint(len(value)) + value


def text(number: int, value: str) -> bytes:
    """A string field; nothing for an empty one. A lone surrogate, which UTF-8 has not, is escaped."""
    return data(number, value.encode("utf-8", "backslashreplace")) if value else b""


def integers(number: int, values: list[int]) -> bytes:
    """A packed repeated integer field."""
    return data(number, b"".join(map(varint, values)))


def fields(message: bytes) -> Iterator[tuple[int, int | bytes]]:
    """The fields of a message as (number, value). Raises ValueError for anything else."""
    place = 0
    while place < len(message):
        key, place = _read_varint(message, place)
        if key & 7 == _VARINT:
            value, place = _read_varint(message, place)
            yield key >> 3, value
        elif key & 7 == _BYTES:
            length, place = _read_varint(message, place)
            if place + length > len(message):
                raise ValueError("a field ends behind its message")
            yield key >> 3, message[place : place + length]
            place += length
        else:
            raise ValueError(f"a field of wire type {key & 7}")


def _read_varint(message: bytes, place: int) -> tuple[int, int]:
    value = shift = 0
    while True:
        if place == len(message) or shift > 63:
            raise ValueError("an integer without an end")
        byte = message[place]
        value |= (byte & 0x7F) << shift
        place += 1
        if byte < 0x80:
            return value, place
        shift += 7
