"""Measures the language server.

python -m bench.server soak FOLDER [--steps N] [--seed N]
python -m bench.server peers FOLDER FILE [--line N] [--column N] [--only NAME]... [--bin FOLDER] [--query WORD]
"""

from __future__ import annotations

import argparse
import sys
from pathlib import Path


def main() -> int:
    """Runs the command."""
    parser = argparse.ArgumentParser(prog="python -m bench.server", description=__doc__)
    kinds = parser.add_subparsers(dest="kind", required=True)
    soak = kinds.add_parser("soak", help="random edits and questions in real files")
    soak.add_argument("folder", type=Path)
    soak.add_argument("--steps", type=int, default=20_000)
    soak.add_argument("--seed", type=int, default=1)
    peers = kinds.add_parser("peers", help="the same questions to other servers")
    peers.add_argument("folder", type=Path)
    peers.add_argument("file", help="of the folder, in which is asked")
    peers.add_argument("--line", type=int, default=1, help="of a name that is asked about")
    peers.add_argument("--column", type=int, default=1)
    peers.add_argument("--query", default="solve", help="what symbols of the program are looked for")
    peers.add_argument("--only", action="append", help="a server; all of them without it")
    peers.add_argument("--bin", type=Path, help="where the other servers are installed")
    peers.add_argument("--timeout", type=float, default=120)
    given = parser.parse_args()
    if given.kind == "soak":
        from bench.server.soak import run

        return run(given.folder.resolve(), given.steps, given.seed)
    from bench.server.peers import compare

    return compare(given)


if __name__ == "__main__":
    sys.exit(main())
