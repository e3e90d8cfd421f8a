"""JSON, as messages are made of it: read and written natively where it is plain.

What is not, such as numbers with a point, is left to json, and so is saying what is wrong. Loading that takes as long
as half of a first answer.
"""

from __future__ import annotations

from quillet.tarvex import _host

TYPE_CHECKING = False
if TYPE_CHECKING:
    from typing import Any


def decode(text: bytes) -> Any:
    """What a text says. Raises `ValueError` for what is no JSON, `RecursionError` for what is nested too deeply."""
    try:
        return _host.ReadJson(text)
    except ValueError:
        from json import loads

        return loads(text)


def encode(value: Any) -> bytes:
    """The text of a value, in ASCII. Raises `TypeError` and `ValueError` for what has none."""
    try:
        return _host.WriteJson(value)
    except TypeError:
        from json import dumps

        return dumps(value, separators=(",", ":")).encode()
