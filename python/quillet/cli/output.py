"""The formats of `quillet analyze`, which the core writes: text for people, JSON lines for programs.

docs/cli.md describes both.
"""

from __future__ import annotations

import json

from quillet.cli.show import Style, width
from quillet.host import language_version

# The `schema` of the first line; raised where a key changes its meaning or goes.
JSON_SCHEMA = 1


def output_header(form: str, version: tuple[int, int] | None) -> bytes:
    """What stands in front of the first file."""
    if form != "jsonl":
        return b""
    python = "{}.{}".format(*language_version(version))
    header = {"type": "header", "schema": JSON_SCHEMA, "python": python}
    return json.dumps(header, separators=(",", ":")).encode() + b"\n"


def output_format(form: str, errors_only: bool, style: Style | None = None) -> tuple[object, ...]:
    """The format as the core takes it; text has the colours of standard output without a style."""
    if form == "jsonl":
        return form, errors_only
    return form, errors_only, (style or Style.of_stdout()).on, lambda code_point: width(chr(code_point))
