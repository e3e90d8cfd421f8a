"""Messages as bytes: read from one file descriptor, written to another.

Descriptors, and not the streams of `sys`: a thread that waits in one of those when the interpreter ends would abort it.
"""

from __future__ import annotations

import os
from _thread import allocate_lock

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterator

_CHUNK = 1 << 18
_MOST_HEADERS = 1 << 16
_MOST_BODY = 1 << 30


class MalformedFrame(Exception):
    """What stands where a message should is none; reading goes on behind it."""


class MessageReader:
    """The bodies of messages, each with its header in front."""

    def __init__(self, descriptor: int) -> None:
        self._descriptor = descriptor
        self._held = bytearray()

    def messages(self) -> Iterator[bytes | MalformedFrame]:
        """Body after body, until the stream ends."""
        while True:
            header = self._header()
            if header is None:
                return
            length = _length_in(header)
            if length is None:
                yield MalformedFrame("a message needs a Content-Length, and none that is larger than a gigabyte")
                continue
            body = self._take(length)
            if body is None:
                return
            yield body

    def _header(self) -> bytes | None:
        """Up to the empty line; None at the end of the stream."""
        searched = 0
        while True:
            end = self._held.find(b"\r\n\r\n", searched)
            if end >= 0 or len(self._held) > _MOST_HEADERS:
                size = end + 4 if end >= 0 else len(self._held)
                header = bytes(self._held[:size])
                del self._held[:size]
                return header
            searched = max(len(self._held) - 3, 0)
            if not self._read():
                return None

    def _take(self, length: int) -> bytes | None:
        while len(self._held) < length:
            if not self._read():
                return None
        body = bytes(memoryview(self._held)[:length])
        del self._held[:length]
        return body

    def _read(self) -> bool:
        try:
            chunk = os.read(self._descriptor, _CHUNK)
        except OSError:
            return False
        self._held += chunk
        return bool(chunk)


def _length_in(header: bytes) -> int | None:
    # What is left of a body whose length was wrong may stand in front on the same line.
    for line in header.split(b"\r\n"):
        name, colon, value = line.rpartition(b":")
        if colon and name.lower().endswith(b"content-length"):
            value = value.strip()
            if value.isdigit() and len(value) < 12 and int(value) <= _MOST_BODY:
                return int(value)
            return None
    return None


class MessageWriter:
    """Where messages are written, whole ones, by any thread. What a client that has gone does not read is dropped."""

    def __init__(self, descriptor: int) -> None:
        self._descriptor = descriptor
        self._lock = allocate_lock()
        self.is_broken = False

    def write(self, data: bytes) -> None:
        """Writes bytes that have their header."""
        with self._lock:
            rest = memoryview(data)
            while rest and not self.is_broken:
                try:
                    rest = rest[os.write(self._descriptor, rest) :]
                except OSError:
                    self.is_broken = True

    def write_body(self, body: bytes) -> None:
        """Writes a message of its own."""
        self.write(b"Content-Length: %d\r\n\r\n%s" % (len(body), body))

    def close(self) -> None:
        """Does nothing: the stream ends with the process."""
