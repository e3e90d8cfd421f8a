"""The regular files of a tar archive in one pass, compressed or not.

What an archive of sources needs of the formats (the old one, ustar, GNU's and pax) and no more: `tarfile` takes longer
for the headers of small files than their analysis takes. The formats are laid down in pax(1) of POSIX: blocks of 512
bytes, a header with octal numbers, and headers before it with what does not fit in.
"""

from __future__ import annotations

import zlib
from collections.abc import Callable, Iterator
from typing import Any, BinaryIO

_inflate: Any
try:
    from isal import isal_zlib as _inflate  # several times as fast
except ImportError:
    _inflate = zlib

_BLOCK = 512
_ZEROS = bytes(_BLOCK)
# Bytes that are read at once, and that one step of unpacking gives at most.
_READ_BYTES, _STEP_BYTES = 1 << 16, 1 << 17
# A header that holds more describes no file.
_MOST_HEADER_BYTES = 1 << 20
_REGULAR = b"0\x007"
# Links, devices, folders and pipes, which have no content whatever their size says.
_WITHOUT_CONTENT = b"123456"


class TarError(Exception):
    """An archive that cannot be read on; the message says why."""


def regular_files(path: str, wants: Callable[[str], bool], most_bytes: int) -> Iterator[tuple[str, int, bytes | None]]:
    """(name, size, content) of the files of an archive whose names are wanted.

    There is no content of those that are larger, nor of those that are stored with holes. Raises `TarError` where the
    archive breaks off or is none, and `OSError`.
    """
    with open(path, "rb") as file:
        stream = _Stream(_unpacked(file))
        shared: dict[str, str] = {}
        own: dict[str, str] = {}
        long_name: bytes | None = None
        while (header := stream.read(_BLOCK)) != _ZEROS:
            if not header:
                return
            if not _is_header(header):
                raise TarError("there is no header where one is due")
            kind = header[156]
            size = _number(header[124:136])
            if kind in b"xgXL":
                if size > _MOST_HEADER_BYTES:
                    raise TarError("a header is too large")
                data = stream.read(size)
                stream.skip(-size % _BLOCK)
                if kind == ord("L"):
                    long_name = data.partition(b"\0")[0]
                elif kind == ord("g"):
                    shared.update(_attributes(data))
                else:
                    own = _attributes(data)
                continue
            if kind == ord("K"):  # where a link leads to
                stream.skip(size + -size % _BLOCK)
                continue
            attributes = {**shared, **own} if shared else own
            if "size" in attributes:
                size = _decimal(attributes["size"])
            name = attributes.get("path") or _shown(long_name if long_name is not None else _name(header))
            has_holes = kind == ord("S") or (own and any(key.startswith("GNU.sparse.") for key in own))
            own, long_name = {}, None
            if kind in _WITHOUT_CONTENT:
                continue
            if kind == ord("S"):
                _skip_map(stream, header)
            is_folder = kind == 0 and name.endswith("/")
            if (kind not in _REGULAR and not has_holes) or is_folder or not wants(name):
                stream.skip(size + -size % _BLOCK)
            elif has_holes or size > most_bytes:
                yield name, size, None
                stream.skip(size + -size % _BLOCK)
            else:
                content = stream.read(size)
                if len(content) < size:
                    raise TarError("the archive breaks off in a file")
                stream.skip(-size % _BLOCK)
                yield name, size, content


def _is_header(header: bytes) -> bool:
    """Whether its sum is what it says: of its bytes, those of the sum counted as blanks."""
    if len(header) < _BLOCK:
        raise TarError("the archive breaks off in a header")
    said = _number(header[148:156])
    counted = header[:148] + b"        " + header[156:]
    # The lower half of Adler's sum is that of the bytes and 1, and far faster than adding them up.
    if zlib.adler32(counted) & 0xFFFF == (said + 1) % 65521:
        return True
    return said == sum(byte - 256 if byte > 127 else byte for byte in counted)


def _number(field: bytes) -> int:
    """Octal digits, or bytes behind a mark where it is a large one."""
    if field[0] in (0x80, 0xFF):
        return int.from_bytes(field[1:], "big") if field[0] == 0x80 else 0
    digits = field.partition(b"\0")[0].strip()
    try:
        return int(digits or b"0", 8)
    except ValueError:
        raise TarError("a number in a header is none") from None


def _decimal(text: str) -> int:
    try:
        number = int(text)
    except ValueError:
        number = -1
    if number < 0:
        raise TarError("a number in a header is none")
    return number


def _name(header: bytes) -> bytes:
    name = header[:100].partition(b"\0")[0]
    if header[257:262] == b"ustar" and header[262] == 0:
        prefix = header[345:500].partition(b"\0")[0]
        return prefix + b"/" + name if prefix else name
    return name


def _shown(name: bytes) -> str:
    return name.decode("utf-8", "backslashreplace")


def _attributes(data: bytes) -> dict[str, str]:
    """What a pax header says: lines of their own length, a name and a value."""
    attributes = {}
    at = 0
    while at < len(data) and data[at] != 0:
        length, blank, _ = data[at : at + 20].partition(b" ")
        if not blank or not length.isdigit() or int(length) <= len(length) + 1:
            raise TarError("a header with attributes is broken")
        key, is_there, value = data[at + len(length) + 1 : at + int(length) - 1].partition(b"=")
        if not is_there:
            raise TarError("a header with attributes is broken")
        attributes[_shown(key)] = _shown(value)
        at += int(length)
    return attributes


def _skip_map(stream: _Stream, header: bytes) -> None:
    """Blocks behind a header that say where the holes of a file are."""
    goes_on = header[482]
    while goes_on:
        block = stream.read(_BLOCK)
        if len(block) < _BLOCK:
            raise TarError("the archive breaks off in a header")
        goes_on = block[504]


# ---- bytes ----


class _Stream:
    """Bytes that come in pieces, from the front to the back."""

    def __init__(self, pieces: Iterator[bytes]) -> None:
        self._pieces = pieces
        self._piece = b""
        self._at = 0

    def read(self, size: int) -> bytes:
        """So many bytes, fewer at the end."""
        end = self._at + size
        if end <= len(self._piece):
            data = self._piece[self._at : end]
            self._at = end
            return data
        taken = [self._piece[self._at :]]
        left = end - len(self._piece)
        while left > 0 and self._next():
            taken.append(self._piece[:left])
            self._at = min(left, len(self._piece))
            left -= self._at
        return b"".join(taken)

    def skip(self, size: int) -> None:
        """Passes over so many bytes. Raises `TarError` where there are fewer."""
        self._at += size
        while self._at > len(self._piece):
            left = self._at - len(self._piece)
            if not self._next():
                raise TarError("the archive breaks off")
            self._at = left

    def _next(self) -> bool:
        self._piece = next(self._pieces, b"")
        self._at = 0
        return bool(self._piece)


def _unpacked(file: BinaryIO) -> Iterator[bytes]:
    """The content of a file in pieces, unpacked by what its first bytes say of it."""
    first = file.read(_READ_BYTES)
    if first.startswith(b"\x1f\x8b"):
        return _gunzipped(file, first)
    if first.startswith(b"BZh"):
        import bz2

        return _decompressed(file, first, bz2.BZ2Decompressor, OSError)
    if first.startswith(b"\xfd7zXZ\x00"):
        import lzma

        return _decompressed(file, first, lzma.LZMADecompressor, lzma.LZMAError)
    return _plain(file, first)


def _plain(file: BinaryIO, data: bytes) -> Iterator[bytes]:
    while data:
        yield data
        data = file.read(_READ_BYTES)


def _gunzipped(file: BinaryIO, data: bytes) -> Iterator[bytes]:
    try:
        while data:
            inflater = _inflate.decompressobj(31)
            while True:
                piece = inflater.decompress(data, _STEP_BYTES)
                if piece:
                    yield piece
                if inflater.eof:
                    break
                data = inflater.unconsumed_tail or file.read(_READ_BYTES)
                if not (data or piece):
                    raise TarError("the archive breaks off")
            # Another stream may follow, or zeros to the end of a block.
            data = inflater.unused_data.lstrip(b"\0") or file.read(_READ_BYTES).lstrip(b"\0")
    except (zlib.error, _inflate.error) as error:
        raise TarError(str(error)) from error


def _decompressed(file: BinaryIO, data: bytes, make: Callable[[], Any], failure: type[Exception]) -> Iterator[bytes]:
    try:
        while data:
            unpacker = make()
            while True:
                piece = unpacker.decompress(data, _STEP_BYTES)
                if piece:
                    yield piece
                if unpacker.eof:
                    break
                data = file.read(_READ_BYTES) if unpacker.needs_input else b""
                if unpacker.needs_input and not data:
                    raise TarError("the archive breaks off")
            data = unpacker.unused_data.lstrip(b"\0") or file.read(_READ_BYTES).lstrip(b"\0")
    except (failure, EOFError, ValueError) as error:
        raise TarError(str(error)) from error
