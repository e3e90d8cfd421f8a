"""The command `quillet`: its commands and options, and nothing of what they do.

What a command needs is imported when it runs, so that `quillet --help` answers at once.

Exit codes: 0 done, 1 a file could not be read (or, with --strict, has a syntax error), 2 wrong usage.
"""

from __future__ import annotations

import re
import sys

import click


class PythonVersion(click.ParamType):  # type: ignore[type-arg,unused-ignore]
    """A version such as 2.7 or 3.12, as the tuple that the host API takes."""

    name = "X.Y"

    def convert(self, value: object, param: click.Parameter | None, ctx: click.Context | None) -> tuple[int, int]:
        match = re.fullmatch(r"(2\.7|3\.\d{1,2})(?:\.\d{1,4})?", str(value))
        if match is None:
            self.fail(f"{value!r} is not 2.7 or 3.x", param, ctx)
        major, _, minor = match[1].partition(".")
        return int(major), int(minor)


_python = click.option(
    "--python",
    "version",
    type=PythonVersion(),
    help="The version of Python that the source is written for; that of the running interpreter without it.",
)
_stdin_filename = click.option(
    "--stdin-filename",
    metavar="NAME",
    default="<stdin>",
    help="The name under which standard input (-) is shown.",
)


@click.group(context_settings={"help_option_names": ["-h", "--help"]})
@click.version_option(package_name="quillet", message="quillet %(version)s")
def main() -> None:
    """Says what each statement of a Python source tells about names."""


@main.command()
@click.argument("paths", nargs=-1, required=True, metavar="PATH...")
@click.option(
    "--format",
    "form",
    type=click.Choice(["text", "jsonl"]),
    default="text",
    show_default=True,
    help="text for people, jsonl (a JSON object a line) for programs.",
)
@_python
@click.option("--errors-only", is_flag=True, help="Show syntax errors alone.")
@click.option("--strict", is_flag=True, help="Exit with 1 where a syntax error was found.")
@click.option("--no-gitignore", is_flag=True, help="Analyse what .gitignore files exclude, too.")
@_stdin_filename
def analyze(
    paths: tuple[str, ...],
    form: str,
    version: tuple[int, int] | None,
    errors_only: bool,
    strict: bool,
    no_gitignore: bool,
    stdin_filename: str,
) -> None:
    """Analyses files and folders, and standard input for "-".

    In a folder these are the files that end in .py, .pyi or .pyw and those whose first line names Python
    as their interpreter. A file that is named itself is analysed whatever its name.
    """
    from quillet.cli.analyze import run

    sys.exit(
        run(
            paths,
            form=form,
            version=version,
            errors_only=errors_only,
            strict=strict,
            gitignore=not no_gitignore,
            stdin_filename=stdin_filename,
        )
    )


@main.command()
@click.argument("target", metavar="FILE[:LINE]")
@_python
@_stdin_filename
def tree(target: str, version: tuple[int, int] | None, stdin_filename: str) -> None:
    """Shows the parse trees of a file, or of the statement that stands on LINE (from 1)."""
    from quillet.cli.tree import run

    sys.exit(run(target, version=version, stdin_filename=stdin_filename))
