"""The texts that an editor holds, and how it calls files."""

from __future__ import annotations

import os

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Iterator

# The letters that mean themselves in a path and in a URI; most of both have no other ones.
_PLAIN = "/ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._~-"


def path_of(uri: str) -> str:
    """The path that a URI stands for; one of its own for what is no file, such as a text without a name."""
    if os.name != "nt" and uri.startswith("file:///") and _is_plain(uri[7:]):
        return os.path.abspath(uri[7:])
    from urllib.parse import unquote_to_bytes, urlsplit

    parts = urlsplit(uri)
    if parts.scheme != "file":
        name = "".join(letter if letter.isalnum() else "_" for letter in uri)
        return os.path.join(os.path.abspath(os.sep), "unnamed", f"{name}.py")
    path = os.fsdecode(unquote_to_bytes(parts.path))
    if os.name == "nt":
        if path[:1] == "/" and path[1:2].isalpha() and path[2:3] == ":":
            path = path[1:]
        elif parts.netloc:
            path = f"//{parts.netloc}{path}"
    return os.path.abspath(path)


def uri_of(path: str) -> str:
    """The URI of a file."""
    if os.name == "nt":
        path = "/" + path.replace("\\", "/")
    if path.startswith("/") and _is_plain(path):
        return "file://" + path
    from urllib.parse import quote

    return "file://" + quote(os.fsencode(path))


def _is_plain(text: str) -> bool:
    # Of a text of other letters as well, taking these off its ends leaves something.
    return not text.strip(_PLAIN)


class Document:
    """A text that the editor holds. The workspaces have its content; this says which one it is."""

    __slots__ = ("is_python", "is_read", "outline", "path", "uri", "version")

    def __init__(self, uri: str, path: str, version: int, is_python: bool) -> None:
        self.uri = uri
        self.path = path
        self.version = version
        self.is_python = is_python
        self.is_read = True  # not too large for that
        self.outline: bytes | None = None  # of this text; editors ask for it again and again


class Documents:
    """What is open, by URI."""

    def __init__(self) -> None:
        self._by_uri: dict[str, Document] = {}
        self._by_path: dict[str, Document] = {}

    def __iter__(self) -> Iterator[Document]:
        return iter(self._by_uri.values())

    def get(self, uri: str) -> Document | None:
        return self._by_uri.get(uri)

    def path_of(self, uri: str) -> str:
        """The path that a URI stands for, which is known of what is open."""
        document = self._by_uri.get(uri)
        return path_of(uri) if document is None else document.path

    def at(self, path: str) -> Document | None:
        return self._by_path.get(path)

    def add(self, document: Document) -> None:
        self._by_uri[document.uri] = document
        self._by_path[document.path] = document

    def remove(self, uri: str) -> Document | None:
        document = self._by_uri.pop(uri, None)
        if document is not None:
            self._by_path.pop(document.path, None)
        return document

    def uri_of(self, path: str) -> str:
        """The URI of a file, as the editor writes it where it has it open."""
        document = self._by_path.get(path)
        return uri_of(path) if document is None else document.uri
