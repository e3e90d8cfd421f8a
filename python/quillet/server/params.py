"""The parameters of messages, as objects with the protocol's names in the form of Python's.

What a message must hold is what lsprotocol says. Loading that takes ten times as long as a first answer, so messages
that are plainly right are read here: those that editors send all the time, with every field that an answer looks at
there and of its kind. Whatever else comes, wrong or rare, is read by the library, which says what is wrong with it.
"""

from __future__ import annotations

from types import SimpleNamespace

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from typing import Any

    Reader = Callable[[Any], Any]
    # The names of fields here and in messages, and what reads the value, which is None where there is none.
    Fields = tuple[tuple[str, str, Reader], ...]

_MOST = 2**31


class _NotPlain(Exception):
    """A value is of another kind."""


def read(method: str, params: Any) -> Any:
    """The parameters of a request or a notification. Raises an exception of the library's for wrong ones."""
    if method in _UNREAD:
        return params
    fields = _PLAIN.get(method)
    if fields is not None:
        try:
            made = _object(params, fields)
            return params if method in _AS_GIVEN else made
        except _NotPlain:
            pass
    from quillet.server.library import read_params

    made = read_params(method, params)
    return params if method in _AS_GIVEN else made


def _object(given: Any, fields: Fields) -> SimpleNamespace:
    if type(given) is not dict:
        raise _NotPlain
    return SimpleNamespace(**{name: reader(given.get(key)) for name, key, reader in fields})


def _of(kind: type) -> Reader:
    def one(value: Any) -> Any:
        if type(value) is not kind:
            raise _NotPlain
        return value

    return one


def _number(value: Any) -> int:
    if type(value) is not int or not 0 <= value < _MOST:
        raise _NotPlain
    return value


def _any(value: Any) -> Any:
    return value


def _maybe(reader: Reader) -> Reader:
    return lambda value: None if value is None else reader(value)


def _objects(*fields: tuple[str, str, Reader]) -> Reader:
    return lambda value: _object(value, fields)


def _list(reader: Reader) -> Reader:
    def each(value: Any) -> list[Any]:
        if type(value) is not list:
            raise _NotPlain
        return [reader(item) for item in value]

    return each


_text, _flag = _of(str), _of(bool)
_position = _objects(("line", "line", _number), ("character", "character", _number))
_range = _objects(("start", "start", _position), ("end", "end", _position))
_document = _objects(("uri", "uri", _text))
_versioned = _objects(("uri", "uri", _text), ("version", "version", _of(int)))
_opened = _objects(
    ("uri", "uri", _text),
    ("language_id", "languageId", _text),
    ("version", "version", _of(int)),
    ("text", "text", _text),
)
_change = _objects(("range", "range", _maybe(_range)), ("text", "text", _text))
_item = _objects(("uri", "uri", _text), ("selection_range", "selectionRange", _range))
_file_event = _objects(("uri", "uri", _text), ("type", "type", _of(int)))

_DOCUMENT = ("text_document", "textDocument", _document)
_PLACE = (_DOCUMENT, ("position", "position", _position))
_PART = (_DOCUMENT, ("range", "range", _range))
_CONTEXT = ("context", "context", _objects(("include_declaration", "includeDeclaration", _flag)))

_PLAIN: dict[str, Fields] = {
    "textDocument/didOpen": (("text_document", "textDocument", _opened),),
    "textDocument/didChange": (
        ("text_document", "textDocument", _versioned),
        ("content_changes", "contentChanges", _list(_change)),
    ),
    **dict.fromkeys(
        (
            "textDocument/didClose", "textDocument/didSave", "textDocument/documentSymbol",
            "textDocument/foldingRange", "textDocument/semanticTokens/full",
        ),
        (_DOCUMENT,),
    ),
    **dict.fromkeys(
        (
            "textDocument/completion", "textDocument/hover", "textDocument/signatureHelp", "textDocument/definition",
            "textDocument/declaration", "textDocument/typeDefinition", "textDocument/implementation",
            "textDocument/documentHighlight", "textDocument/prepareRename", "textDocument/prepareCallHierarchy",
            "textDocument/prepareTypeHierarchy",
        ),
        _PLACE,
    ),
    "textDocument/references": (*_PLACE, _CONTEXT),
    "textDocument/rename": (*_PLACE, ("new_name", "newName", _text)),
    "textDocument/semanticTokens/range": _PART,
    "textDocument/inlayHint": _PART,
    "textDocument/selectionRange": (_DOCUMENT, ("positions", "positions", _list(_position))),
    "textDocument/diagnostic": (_DOCUMENT, ("previous_result_id", "previousResultId", _maybe(_text))),
    "completionItem/resolve": (("label", "label", _text),),
    **dict.fromkeys(
        (
            "callHierarchy/incomingCalls", "callHierarchy/outgoingCalls", "typeHierarchy/supertypes",
            "typeHierarchy/subtypes",
        ),
        (("item", "item", _item),),
    ),
    "initialize": (("capabilities", "capabilities", _of(dict)),),
    "workspace/symbol": (("query", "query", _text),),
    "workspace/didChangeConfiguration": (("settings", "settings", _any),),
    "workspace/didChangeWatchedFiles": (("changes", "changes", _list(_file_event)),),
}  # fmt: skip
# What goes back as it came, and what holds more than is looked at by name.
_AS_GIVEN = frozenset({"completionItem/resolve", "initialize"})
_UNREAD = frozenset({"initialized", "shutdown"})
