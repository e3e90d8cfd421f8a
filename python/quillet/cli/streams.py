"""Standard output for commands that may write much: buffered, safe for any text, quiet when closed."""

from __future__ import annotations

import io
import os
import sys
from collections.abc import Iterator
from contextlib import contextmanager
from typing import TextIO


@contextmanager
def quiet_output() -> Iterator[TextIO]:
    """Standard output, flushed at the end. A reader that went away ends the block, and no more.

    A character that the output's encoding lacks is written as an escape.
    """
    out = sys.stdout
    if isinstance(out, io.TextIOWrapper):
        out.reconfigure(errors="backslashreplace")
    try:
        yield out
        out.flush()
    except BrokenPipeError:
        # The interpreter flushes once more when it ends; that must not fail again.
        os.dup2(os.open(os.devnull, os.O_WRONLY), sys.stdout.fileno())
