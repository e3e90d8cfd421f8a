"""Records in words: what the info half of a (name, info) pair says, as a kind and a detail.

The core writes a record as two byte strings. An info string that begins with ":" and a kind byte is
prefixed, and what follows the prefix is its detail; any other is the source text of an equivalent
expression. One form is told by its end instead: a class's name with `kClassInstanceSuffix` behind it
means an instance of that class. docs/records.md shows every form.
"""

from __future__ import annotations

import enum
from typing import NamedTuple

from quillet import symbolinfo


class RecordKind(str, enum.Enum):
    """What a record says of its name. The values are the `kind` of the JSON output."""

    SET = "set"
    GET = "get"
    WITHIN_EXPR = "within_expr"
    CALLED = "called"
    IMPORT = "import"
    FROM_IMPORT = "from_import"
    IMPORT_AS = "import_as"
    GLOBAL = "global"
    NONLOCAL = "nonlocal"
    TYPE_PARAMETER = "type_parameter"
    EXPRESSION = "expression"
    LITERAL = "literal"
    HINT = "hint"
    INSTANCE = "instance"
    EQUAL = "equal"
    OTHER = "other"


class Record(NamedTuple):
    """One fact about one name.

    `name` is a dotted name, the text of a target, or one of "return", "yield" and "*", which stand for
    what a statement returns, yields, and imports by star. A parameter that a signature comment knows by
    its place alone is called "<argument 0>", counted from 0. `detail` is text, empty where the kind says
    everything. `is_parameter` tells a fact about the scope that the statement opens from one about the
    scope in which it stands.
    """

    name: str
    kind: RecordKind
    detail: str
    is_parameter: bool


_KIND_OF_BYTE = {
    symbolinfo.kSetPrefix[1]: RecordKind.SET,
    symbolinfo.kGetPrefix[1]: RecordKind.GET,
    symbolinfo.kWithinExprPrefix[1]: RecordKind.WITHIN_EXPR,
    symbolinfo.kCalledPrefix[1]: RecordKind.CALLED,
    symbolinfo.kImportPrefix[1]: RecordKind.IMPORT,
    symbolinfo.kFromImportPrefix[1]: RecordKind.FROM_IMPORT,
    symbolinfo.kImportAsNamePrefix[1]: RecordKind.IMPORT_AS,
    symbolinfo.kGlobalPrefix[1]: RecordKind.GLOBAL,
    symbolinfo.kNonlocalPrefix[1]: RecordKind.NONLOCAL,
    symbolinfo.kTypeParameterPrefix[1]: RecordKind.TYPE_PARAMETER,
    symbolinfo.kExpressionEquivPrefix[1]: RecordKind.EXPRESSION,
    symbolinfo.kTypedLiteralPrefix[1]: RecordKind.LITERAL,
    symbolinfo.kTypeHintPrefix[1]: RecordKind.HINT,
}
_PREFIX_LENGTH = symbolinfo.kPrefixLen
_ARG_PREFIX = symbolinfo.kArgPrefix
_SUFFIX = symbolinfo.kClassInstanceSuffix


def decode_record(name: bytes, info: bytes, is_parameter: bool) -> Record:
    """The record of a raw pair. Any bytes are taken; what is no UTF-8 is shown by escapes."""
    by_place = name.startswith(_ARG_PREFIX)
    shown = f"<argument {_text(name[_PREFIX_LENGTH:])}>" if by_place else _text(name)
    if name == b"yield" and info.startswith(b"from "):
        # What `yield from` yields from is itself an info string behind the word.
        inner = decode_record(name, info[5:], is_parameter)
        return inner._replace(detail=f"from {inner.detail}".rstrip())
    if len(info) >= 2 and info[0] == 0x3A and info[1] != 0:
        kind = _KIND_OF_BYTE.get(info[1], RecordKind.OTHER)
        if kind is RecordKind.OTHER:
            return Record(shown, kind, _text(info), is_parameter)
        detail = _text(info[_PREFIX_LENGTH:])
        if kind is RecordKind.LITERAL:
            detail = detail.removesuffix(_SUFFIX)
        return Record(shown, kind, detail, is_parameter)
    detail = _text(info)
    if detail.endswith(_SUFFIX):
        return Record(shown, RecordKind.INSTANCE, detail.removesuffix(_SUFFIX), is_parameter)
    return Record(shown, RecordKind.EQUAL, detail, is_parameter)


def describe(record: Record) -> str:
    """The kind and the detail of a record as a phrase that follows the name."""
    detail = record.detail
    match record.kind:
        case RecordKind.SET:
            return "parameter" if record.is_parameter else "set"
        case RecordKind.GET:
            return "read"
        case RecordKind.WITHIN_EXPR:
            return f"set inside the expression, at token {detail}"
        case RecordKind.CALLED:
            return f"called with {detail}"
        case RecordKind.IMPORT:
            return f"import {detail}"
        case RecordKind.FROM_IMPORT:
            module, _, name = detail.rpartition(" ")
            return f"from {module} import {name}"
        case RecordKind.IMPORT_AS:
            return f"imported as {detail}"
        case RecordKind.GLOBAL:
            return "declared global"
        case RecordKind.NONLOCAL:
            return "declared nonlocal"
        case RecordKind.TYPE_PARAMETER:
            return f"type parameter {detail}".rstrip()
        case RecordKind.EXPRESSION | RecordKind.EQUAL:
            return f"= {detail}" if detail else "= nothing"
        case RecordKind.LITERAL:
            return _describe_literal(detail)
        case RecordKind.HINT:
            return f"hint {detail}"
        case RecordKind.INSTANCE:
            return f"instance of {detail}"
        case RecordKind.OTHER:
            return detail


def _describe_literal(detail: str) -> str:
    start = "from " if detail.startswith("from ") else ""
    cls, _, text = detail.removeprefix("from ").partition(": ")
    if text == cls:
        return f"= {start}{text}"  # None
    if text:
        return f"= {start}{text} ({cls})"
    return f"= {start}{'an' if cls[:1] in 'aeiou' else 'a'} {cls}"


def _text(value: bytes) -> str:
    return value.decode("utf-8", "backslashreplace")
