"""The command `quillet`. What it does is in the modules beside this one, a command each.

Exit codes: 0 done, 1 a file could not be read (or, with --strict, has a syntax error), 2 wrong usage.
"""

from __future__ import annotations

import os
import sys
from collections.abc import Sequence

PROGRAM = "quillet"


def main(arguments: Sequence[str] | None = None) -> None:
    """Runs the command with `arguments`, those of the process without any, and ends by SystemExit."""
    given = list(sys.argv[1:] if arguments is None else arguments)
    if given[:1] == ["find"] and "_QUILLET_COMPLETE" not in os.environ:
        from quillet.cli.find_options import plain_parameters

        parameters = plain_parameters(given[1:])
        if parameters is not None:
            from quillet.cli.find import ask

            sys.exit(ask(**parameters))
    from quillet.cli.commands import group

    group.main(given, prog_name=PROGRAM)
