"""The command `quillet`. What it does is in the modules beside this one, a command each.

Exit codes: 0 done, 1 a file could not be read (or, with --strict, has a syntax error), 2 wrong usage or an
output that cannot be written, 130 interrupted.
"""

from __future__ import annotations

import os
import sys

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Sequence

PROGRAM = "quillet"


def main(arguments: Sequence[str] | None = None) -> None:
    """Runs the command with `arguments`, those of the process without any, and ends by SystemExit."""
    given = list(sys.argv[1:] if arguments is None else arguments)
    try:
        from quillet.cli.streams import run_to_end

        run_to_end(lambda: _run(given))
    except KeyboardInterrupt:  # before the streams were in place
        sys.exit(130)


def _run(given: list[str]) -> None:
    # What needs none of click, which takes longer to load than either takes to answer.
    if given == ["--version"]:
        from quillet import __version__

        print(f"{PROGRAM} {__version__}")
        sys.exit(0)
    if given[:1] == ["find"] and "_QUILLET_COMPLETE" not in os.environ:
        from quillet.cli.find_options import plain_parameters

        parameters = plain_parameters(given[1:])
        if parameters is not None:
            from quillet.cli.find import ask

            sys.exit(ask(**parameters))
    # Loading what reads options takes longer than all else that is done for a plain one.
    if given[:1] == ["serve"] and set(given[1:]) <= {"--stdio"} and "_QUILLET_COMPLETE" not in os.environ:
        from quillet.cli.serve import run

        sys.exit(run(None))
    import click

    from quillet.cli.commands import group

    try:
        code = group.main(given, prog_name=PROGRAM, standalone_mode=False)
    except click.Abort as error:  # what click makes of an interrupt
        raise KeyboardInterrupt from error
    except click.ClickException as error:
        error.show()
        code = error.exit_code
    sys.exit(code if isinstance(code, int) else 0)
