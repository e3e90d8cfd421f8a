"""Token types, non-nested scanning, a tokenizer over a string, a clock, a logger, the bits of floats."""

from __future__ import annotations

import logging
import time

from quillet.tarvex import _siblings

globals().update({name: value for name, value in vars(_siblings._fastaccess).items() if not name.startswith("__")})

# The clock that GetNowTime and OutOfTime ask, looked up at each call: a test may put another in its place.
__TimeFunc = time.time


class CLogger:
    """Three log entries of rising weight, which a subclass may override one by one.

    Each forwards to `Log`, which formats `s % args` only where the line is wanted and hands it to the
    logger "quillet" of the standard library's logging: Log1 as debugging, Log2 as information, Log3 as a
    warning.
    """

    def Log(self, level: int, s: str, args: tuple[object, ...]) -> None:
        logging.getLogger("quillet").log(level, s, *args)

    def Log1(self, s: str, args: tuple[object, ...] = ()) -> None:
        self.Log(logging.DEBUG, s, args)

    def Log2(self, s: str, args: tuple[object, ...] = ()) -> None:
        self.Log(logging.INFO, s, args)

    def Log3(self, s: str, args: tuple[object, ...] = ()) -> None:
        self.Log(logging.WARNING, s, args)
