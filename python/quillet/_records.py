"""Records in words: what the info half of a (name, info) pair says, as a kind and a detail.

The core writes a record as two byte strings and knows how they read; this is how a host sees it.
docs/records.md shows every form.
"""

from __future__ import annotations

import enum
from typing import NamedTuple

from quillet.tarvex import _host


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


# In the core's order. A kind that the core has and this module lacks is an error here.
KINDS = tuple(RecordKind(word) for word in _host.RECORD_KIND_WORDS)


def decode_record(name: bytes, info: bytes, is_parameter: bool) -> Record:
    """The record of a raw pair. Any bytes are taken; what is no UTF-8 is shown by escapes."""
    shown, kind, detail = _host.DecodeRecord(name, info)
    return Record(shown, KINDS[kind], detail, is_parameter)


def describe(record: Record) -> str:
    """The kind and the detail of a record as a phrase that follows the name."""
    return _host.DescribeRecord(record.kind.value, record.detail, record.is_parameter)
