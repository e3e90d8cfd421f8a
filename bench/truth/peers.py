"""The language servers that answers and times are held against, and how each is started."""

from __future__ import annotations

import argparse
import shutil
import sys
from pathlib import Path
from typing import Any

from bench.truth.lsp import LanguageServer

COMMANDS = {
    "ty": ("ty", "server"),
    "basedpyright": ("basedpyright-langserver", "--stdio"),
    "pyrefly": ("pyrefly", "lsp"),
    "zuban": ("zuban", "server"),
    "jedi": ("jedi-language-server",),
}
HOW_TO_GET = "pip install -r bench/requirements.txt"


def Find(name: str) -> list[str] | None:
    """The command of a server: that of the running Python's environment first. None where it is not installed."""
    program, *rest = COMMANDS[name]
    found = shutil.which(program, path=str(Path(sys.executable).parent)) or shutil.which(program)
    return None if found is None else [found, *rest]


def Start(name: str, folder: Path, *, one_core: bool = False, settings: dict[str, Any] | None = None) -> LanguageServer:
    command = Find(name)
    if command is None:
        raise SystemExit(f"{name} is not installed: {HOW_TO_GET}")
    return LanguageServer(name, command, folder, one_core=one_core, settings=settings)


def AddPeers(parser: argparse.ArgumentParser, default: str) -> None:
    parser.add_argument(
        "--peers", type=lambda text: [name for name in text.split(",") if name], default=default.split(","),
        help=f"the servers that are asked as well, with commas ({default}); of {', '.join(COMMANDS)}",
    )  # fmt: skip
