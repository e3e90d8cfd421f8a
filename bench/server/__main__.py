"""Measures the language server.

python -m bench.server soak FOLDER [--steps N] [--seed N]
python -m bench.server peers --project FOLDER FILE LINE COLUMN WORD... [--only NAME]... [--question NAME]...
    [--bin FOLDER] [--save FILE]
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
    peers.add_argument(
        "--project",
        dest="projects",
        action="append",
        required=True,
        nargs=5,
        metavar=("FOLDER", "FILE", "LINE", "COLUMN", "WORD"),
        help="where is asked, at a name behind a dot, and the word that symbols are looked for by",
    )
    peers.add_argument("--only", action="append", help="a server; all of them without it")
    peers.add_argument("--question", dest="questions", action="append", help="a row; all of them without it")
    peers.add_argument("--bin", type=Path, help="where the other servers are installed")
    peers.add_argument("--timeout", type=float, default=120, help="seconds that an answer may take")
    peers.add_argument("--save", type=Path, help="where each figure is written to as well, a line of JSON each")
    given = parser.parse_args()
    if given.kind == "soak":
        from bench.server.soak import run

        return run(given.folder.resolve(), given.steps, given.seed)
    from bench.server.peers import compare

    return compare(given)


if __name__ == "__main__":
    sys.exit(main())
