"""Options that several commands have."""

from __future__ import annotations

import re
from typing import Any

import click

from quillet.cli.find_options import EXCLUDE_OPTION


class PythonVersion(click.ParamType):  # type: ignore[type-arg,unused-ignore]
    """A version such as 2.7 or 3.12, as the tuple that the host API takes."""

    name = "X.Y"

    def convert(self, value: object, param: click.Parameter | None, ctx: click.Context | None) -> tuple[int, int]:
        match = re.fullmatch(r"(2\.7|3\.\d{1,2})(?:\.\d{1,4})?", str(value))
        if match is None:
            self.fail(f"{value!r} is not 2.7 or 3.x", param, ctx)
        major, _, minor = match[1].partition(".")
        return int(major), int(minor)


class PathArgument(click.Path):
    """The name of a file or folder. An empty one is a mistake, such as a variable that is not set."""

    def convert(self, value: Any, param: click.Parameter | None, ctx: click.Context | None) -> Any:
        if not value:
            self.fail("a path is empty", param, ctx)
        return super().convert(value, param, ctx)


python_option = click.option(
    "--python",
    "version",
    type=PythonVersion(),
    help="The version of Python that the source is written for; that of the running interpreter without it.",
)

exclude_option = click.option(
    *EXCLUDE_OPTION.flags, metavar=EXCLUDE_OPTION.metavar, multiple=True, help=EXCLUDE_OPTION.help
)
