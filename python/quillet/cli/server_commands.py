"""The commands that serve other programs: `serve` and `mcp`.

As in the rest of the command line, what a command needs is imported when it runs.
"""

from __future__ import annotations

import sys

import click

from quillet.cli.options import PathArgument, python_option

_log_option = click.option("--log", metavar="FILE", type=PathArgument(), help="Append what happens to FILE.")


@click.command()
@click.option(
    "--root",
    "roots",
    metavar="DIR",
    multiple=True,
    type=PathArgument(),
    help="A folder that may be asked about; without it that of the project around the working folder. May be given"
    " more than once.",
)
@click.option(
    "--environment",
    metavar="PATH",
    type=PathArgument(),
    help="A virtual environment or an interpreter, whose libraries count; the active one without it.",
)
@python_option
@_log_option
def mcp(roots: tuple[str, ...], environment: str | None, version: tuple[int, int] | None, log: str | None) -> None:
    """Answers questions about a program as tools for agents, in the Model Context Protocol over standard input and
    output.

    Nothing is run and nothing is written.
    """
    from quillet.cli.mcp import run
    from quillet.cli.questions import Settings

    sys.exit(run(Settings(roots=roots, environment=environment, version=version), log))


@click.command()
@_log_option
@click.option("--stdio", is_flag=True, hidden=True, expose_value=False)
def serve(log: str | None) -> None:
    """Serves an editor: the Language Server Protocol over standard input and output.

    What is needed for it is installed by "pip install quillet[serve]".

    \b
        quillet serve
        quillet serve --log quillet.log
    """
    from quillet.cli.serve import run

    sys.exit(run(log))


COMMANDS = (serve, mcp)
