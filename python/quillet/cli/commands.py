"""The commands and their options, and nothing of what they do.

What a command needs is imported when it runs, so that `quillet --help` answers at once.
"""

from __future__ import annotations

import sys

import click

from quillet import __version__
from quillet.cli import index_commands, question_commands, server_commands
from quillet.cli.corpus import corpus
from quillet.cli.options import PathArgument, exclude_option, python_option

_stdin_filename = click.option(
    "--stdin-filename",
    metavar="NAME",
    default="<stdin>",
    help="The name under which standard input (-) is shown.",
)


@click.group(context_settings={"help_option_names": ["-h", "--help"]})
@click.version_option(__version__, message="quillet %(version)s")
def group() -> None:
    """Says what each statement of a Python source tells about names."""


@group.command()
@click.argument("paths", nargs=-1, required=True, metavar="PATH...", type=PathArgument())
@click.option(
    "--format",
    "form",
    type=click.Choice(["text", "jsonl"]),
    default="text",
    show_default=True,
    help="text for people, jsonl (a JSON object a line) for programs.",
)
@python_option
@click.option("--errors-only", is_flag=True, help="Show syntax errors alone.")
@click.option("--strict", is_flag=True, help="Exit with 1 where a syntax error was found.")
@click.option("--no-gitignore", is_flag=True, help="Analyse what .gitignore files exclude, too.")
@exclude_option
@click.option(
    "--jobs",
    type=click.IntRange(1, 1024),
    metavar="N",
    help="How many files to analyse at once; one a core without it.",
)
@click.option("--exact", is_flag=True, help="Read statements as quillet.tarvex does, whatever the version has.")
@_stdin_filename
def analyze(
    paths: tuple[str, ...],
    form: str,
    version: tuple[int, int] | None,
    errors_only: bool,
    strict: bool,
    no_gitignore: bool,
    exclude: tuple[str, ...],
    jobs: int | None,
    exact: bool,
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
            exclude=exclude,
            stdin_filename=stdin_filename,
            jobs=jobs,
            exact=exact,
        )
    )


@group.command()
@click.argument("target", metavar="FILE[:LINE]", type=PathArgument())
@python_option
@_stdin_filename
def tree(target: str, version: tuple[int, int] | None, stdin_filename: str) -> None:
    """Shows the parse trees of a file, or of the statement that stands on LINE (from 1)."""
    from quillet.cli.tree import run

    sys.exit(run(target, version=version, stdin_filename=stdin_filename))


for _command in (*index_commands.COMMANDS, *question_commands.COMMANDS, *server_commands.COMMANDS, corpus):
    group.add_command(_command)
