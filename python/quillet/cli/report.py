"""`quillet report`: an index as a static site."""

from __future__ import annotations

import os
import sys

from quillet.cli.find import fail, say_changed
from quillet.cli.show import printable
from quillet.index.questions import Index
from quillet.index.store import IndexProblem, find_index
from quillet.report.site import SiteProblem, write_site


def run(folder: str, *, index: str | None) -> int:
    """Runs the command and returns its exit code."""
    try:
        with Index(index or find_index()) as opened:
            count = write_site(opened, folder, say_changed)
    except (IndexProblem, SiteProblem) as problem:
        return fail(problem)
    except OSError as error:
        print(f"quillet: {printable(folder)}: {error.strerror or error}", file=sys.stderr)
        return 2
    print(f"quillet: {count} files; open {printable(os.path.join(folder, 'index.html'))}", file=sys.stderr)
    return 0
