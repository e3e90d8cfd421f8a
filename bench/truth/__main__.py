"""Runs one of the measurements of bench/truth."""

from __future__ import annotations

import argparse
import importlib
import sys

_RUNNERS = (
    "call_edges",
    "fourslash",
    "jedi_cases",
    "type_facts",
    "agreement",
    "recall",
    "broken",
    "renames",
    "robust",
    "speed",
)


def Main() -> int:
    parser = argparse.ArgumentParser(prog="python -m bench.truth", description=__doc__)
    commands = parser.add_subparsers(required=True, metavar="RUNNER")
    for name in _RUNNERS:
        importlib.import_module(f"bench.truth.{name}").AddTo(commands)
    options = parser.parse_args()
    return int(options.run(options))


if __name__ == "__main__":
    sys.exit(Main())
