"""`quillet stats`: what an index holds, in numbers."""

from __future__ import annotations

import json
import os
from collections.abc import Sequence

from quillet.cli.find import fail, say_outside
from quillet.cli.show import Style, printable
from quillet.cli.streams import quiet_output
from quillet.index.questions import Index
from quillet.index.store import IndexProblem, find_index

_NAMES = 10


def run(*, index: str | None, roots: Sequence[str], as_json: bool) -> int:
    """Runs the command and returns its exit code."""
    try:
        with Index(index or find_index(), roots) as opened:
            counts = opened.counts_now(_NAMES)
            values = {
                "index": opened.path,
                "python": opened.python(),
                "bytes": os.path.getsize(opened.path),
                **counts._asdict(),
                "kinds": dict(counts.kinds),
                "names": dict(counts.names),
            }
            say_outside(opened)
    except (IndexProblem, OSError) as problem:
        return fail(problem)
    with quiet_output() as out:
        if as_json:
            out.write(json.dumps(values) + "\n")
            return 0
        style = Style.of_stdout()
        for key in ("index", "python", "bytes", "files", "lines", "records", "errors"):
            out.write(f"{key:<16}{printable(str(values[key]))}\n")
        for title, rows in (("records by kind", counts.kinds), ("names most used", counts.names)):
            out.write(f"\n{style.name(title)}\n")
            out.writelines(f"  {printable(name):<20}{count:>10}\n" for name, count in rows)
    return 0
