"""What a person who waits sees: one line on standard error that says how far a run is, gone at its end.

There is none without a terminal, and none for a run that ends within a blink. The line is as wide as the
terminal is at that moment at most, and drawn a few times a second at most, so that it neither wraps nor
flickers. Whatever else goes to standard error while it stands goes through `say`, which makes way for it.
"""

from __future__ import annotations

import os
import sys
import time
from contextlib import suppress
from types import TracebackType
from typing import TextIO

# Seconds before the first line, and between two.
_DELAY = 0.4
_INTERVAL = 0.1
# The bar itself, in cells, where there is room for it.
_MOST_BAR = 40
_LEAST_BAR = 8


class Progress:
    """How far a run is. Use it as a context manager; the line is removed at its end, however that comes.

    `total` is how many steps there are, None where nobody knows. `wanted` is false where the data of the
    run goes to the same terminal.
    """

    _on_screen: Progress | None = None

    def __init__(self, label: str, total: int | None = None, *, wanted: bool = True) -> None:
        self._stream = sys.stderr if wanted and is_terminal(sys.stderr) else None
        self._next_draw = 0.0
        self._drawn = False
        self.begin(label, total)

    def begin(self, label: str, total: int | None = None) -> None:
        """Begins a part of the run with a count of its own."""
        self._label = label
        self._total = total
        self._done = 0
        if self._drawn:
            self._next_draw = 0.0
            self._draw()

    def advance(self, steps: int = 1) -> None:
        """Counts what was done."""
        self._done += steps
        if self._stream is not None and time.monotonic() >= self._next_draw:
            self._draw()

    def relabel(self, label: str) -> None:
        """Says from the next drawing on what is being done in other words."""
        self._label = label

    def _draw(self) -> None:
        if self._stream is None:
            return
        text = line_of(self._label, self._done, self._total, _columns(self._stream) - 1)
        self._write(f"\r{text}\x1b[K")
        self._drawn = True
        self._next_draw = time.monotonic() + _INTERVAL

    def clear(self) -> None:
        """Takes the line away until the next step."""
        if self._drawn:
            self._drawn = False
            self._next_draw = 0.0
            self._write("\r\x1b[K")

    def _write(self, text: str) -> None:
        if self._stream is None:
            return
        try:
            self._stream.write(text)
            self._stream.flush()
        except (OSError, ValueError):  # the terminal went away; the run goes on
            self._stream = None

    def __enter__(self) -> Progress:
        self._next_draw = time.monotonic() + _DELAY
        Progress._on_screen = self
        return self

    def __exit__(
        self, exc_type: type[BaseException] | None, exc: BaseException | None, traceback: TracebackType | None
    ) -> None:
        Progress._on_screen = None
        self.clear()
        self._stream = None


def say(text: str) -> None:
    """Writes a line about the run to standard error. `text` is safe to show."""
    if Progress._on_screen is not None:
        Progress._on_screen.clear()
    if sys.stderr is not None:
        with suppress(OSError):  # nobody is left to be told
            print(f"quillet: {text}", file=sys.stderr)


def line_of(label: str, done: int, total: int | None, width: int) -> str:
    """The line for a state of affairs, in `width` cells at most. What matters least goes first."""
    if total is None:
        shown = [f"{label}  {done}", str(done)]
    else:
        share = min(done / total, 1.0) if total else 1.0
        percent = f"{share:4.0%}"
        count = f"{done:>{len(str(total))}}/{total}"
        room = min(width - len(f"{label}  []  {count}  {percent}"), _MOST_BAR)
        bar = ("#" * round(share * room)).ljust(max(room, 0), "-")
        shown = [f"{label}  [{bar}]  {count}  {percent}"] if room >= _LEAST_BAR else []
        shown += [f"{label}  {count}  {percent}", f"{label}  {percent}", percent.strip()]
    return next((text for text in shown if len(text) <= width), "")


def is_terminal(stream: TextIO | None) -> bool:
    """Whether a stream shows what is drawn on it."""
    try:
        return stream is not None and stream.isatty() and os.environ.get("TERM") != "dumb"
    except ValueError:  # closed
        return False


def _columns(stream: TextIO) -> int:
    try:
        # A terminal that does not know its width says 0.
        return os.get_terminal_size(stream.fileno()).columns or 80
    except (OSError, ValueError):
        return 80
