"""`quillet serve`: the language server."""

from __future__ import annotations

import gc
import sys


def run(log_file: str | None) -> int:
    """Serves the client at standard input and output, and returns the exit code of the command."""
    try:
        import pygls  # noqa: F401
    except ImportError:
        print('quillet: the language server needs pygls: pip install "quillet[serve]"', file=sys.stderr)
        return 2
    if log_file is not None:
        try:
            with open(log_file, "a", encoding="utf-8"):
                pass
        except OSError as error:
            print(f"quillet: {log_file}: {error.strerror}", file=sys.stderr)
            return 2
    # What is loaded stays: looking for what has gone in between would find nothing.
    gc.disable()
    from quillet.server.main import serve

    gc.freeze()
    gc.enable()
    return serve(log_file)
