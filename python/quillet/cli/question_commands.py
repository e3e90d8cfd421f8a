"""The commands that ask about a program at a place: `goto`, `references`, `type`, `hover`, `complete`, `callers`,
`rename`.

As in the rest of the command line, what a command needs is imported when it runs.
"""

from __future__ import annotations

import sys
from collections.abc import Callable
from typing import Any

import click

from quillet.cli.options import PathArgument, python_option

_target = click.argument("target", metavar="FILE:LINE:COLUMN", type=PathArgument())
_OPTIONS = (
    click.option(
        "--root",
        "roots",
        metavar="DIR",
        multiple=True,
        type=PathArgument(),
        help="A folder of the program; without it that of the project that FILE belongs to. May be given more than"
        " once.",
    ),
    click.option(
        "--environment",
        metavar="PATH",
        type=PathArgument(),
        help="A virtual environment or an interpreter, whose libraries count; the active one without it.",
    ),
    python_option,
    click.option("--json", "as_json", is_flag=True, help="A JSON object an answer."),
)
_at_least = click.option(
    "--at-least",
    type=click.Choice(["certain", "likely", "by name"]),
    default="by name",
    show_default=True,
    help="How sure an answer has to be.",
)


def _question(command: Callable[..., None]) -> Callable[..., None]:
    """Gives a command its place and the options that all questions have."""
    for option in reversed((_target, *_OPTIONS)):
        command = option(command)
    return command


def _run(kind: str, parameters: dict[str, Any]) -> None:
    from quillet.cli.questions import Settings, ask

    target = parameters.pop("target")
    at_least = parameters.pop("at_least", "by name")
    sys.exit(ask(kind, target, Settings(**parameters), at_least=at_least))


@click.command()
@_question
@_at_least
def goto(**parameters: Any) -> None:
    """Shows where the name at a place is defined.

    The column counts bytes from 1, as in all output.

    \b
        quillet goto examples/shop.py:10:14
    """
    _run("goto", parameters)


@click.command()
@_question
@_at_least
def references(**parameters: Any) -> None:
    """Shows all places of the program that name what is named at a place.

    Those that nothing but their name speaks for are marked, as are those that are likely.

    \b
        quillet references examples/shop.py:7:14
        quillet references examples/shop.py:7:14 --at-least certain
    """
    _run("references", parameters)


@click.command("type")
@_question
def type_command(**parameters: Any) -> None:
    """Shows what the expression at a place may be.

    \b
        quillet type examples/shop.py:10:14
    """
    _run("type", parameters)


@click.command()
@_question
def hover(**parameters: Any) -> None:
    """Shows the declaration and the documentation of what is at a place.

    \b
        quillet hover examples/shop.py:10:20
    """
    _run("hover", parameters)


@click.command()
@_question
def complete(**parameters: Any) -> None:
    """Shows what may be written at a place, the best first.

    \b
        quillet complete examples/shop.py:10:20
    """
    _run("complete", parameters)


@click.command()
@_question
def callers(**parameters: Any) -> None:
    """Shows who calls the function that is named at a place.

    \b
        quillet callers examples/shop.py:6:9
    """
    _run("callers", parameters)


@click.command()
@_question
@click.argument("new_name", metavar="NEW")
@click.option("--write", is_flag=True, help="Change the files.")
@click.option("--likely", is_flag=True, help="Change places that are not certain, too.")
def rename(target: str, new_name: str, write: bool, likely: bool, **parameters: Any) -> None:
    """Gives what is named at a place another name, everywhere in the program, and shows the changes as a diff.

    \b
        quillet rename examples/shop.py:9:9 put
        quillet rename examples/shop.py:9:9 put --write
    """
    from quillet.cli.questions import Settings
    from quillet.cli.questions import rename as run

    sys.exit(run(target, new_name, Settings(**parameters), write=write, only_certain=not likely))


COMMANDS = (goto, references, type_command, hover, complete, callers, rename)
