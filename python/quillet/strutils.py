"""UTF-8 text primitives: characters by byte position, joining, conversion.

Text is str, bytes or bytearray; positions are offsets in its UTF-8 bytes, and nothing is read at or past
an `end_pos`.
"""

from quillet.tarvex import _siblings

globals().update({name: value for name, value in vars(_siblings.strutils).items() if not name.startswith("__")})
