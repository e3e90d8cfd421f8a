"""The standard streams: open whatever the caller closed, quiet where a reader went away, and one end for all.

A stream that was closed leaves its number to the next file that is opened, which would then get what
was meant for the stream. So the numbers are taken before anything is opened: writing to a closed
standard output and reading a closed standard input fail, messages for a closed standard error are lost.
"""

from __future__ import annotations

import io
import os
import sys

TYPE_CHECKING = False
if TYPE_CHECKING:
    from collections.abc import Callable
    from types import TracebackType
    from typing import TextIO

INTERRUPTED = 130
FAILED = 2


def run_to_end(command: Callable[[], object]) -> None:
    """Runs a command and ends by SystemExit, whatever happens to its streams and whoever interrupts it."""
    try:
        open_streams()
        command()
        _flush()
    except KeyboardInterrupt:
        _drop_output()
        sys.exit(INTERRUPTED)
    except BrokenPipeError:
        _drop_output()
        sys.exit(0)
    except OSError as error:
        _drop_output()
        _complain(error)
        sys.exit(FAILED)
    except SystemExit:
        # What is still buffered is written now, where a failure can be told.
        try:
            _flush()
        except BrokenPipeError:
            _drop_output()
        except OSError as error:
            _drop_output()
            _complain(error)
            sys.exit(FAILED)
        raise


def open_streams() -> None:
    """Opens the standard streams that are closed."""
    for number, flags in enumerate((os.O_WRONLY, os.O_RDONLY, os.O_WRONLY)):
        try:
            os.fstat(number)
        except OSError:
            opened = os.open(os.devnull, flags)
            if opened != number:
                os.dup2(opened, number)
                os.close(opened)
    if sys.stdout is None:
        sys.stdout = io.TextIOWrapper(io.BufferedWriter(io.FileIO(1, "w", closefd=False)))
    if sys.stderr is None:
        sys.stderr = io.TextIOWrapper(io.BufferedWriter(io.FileIO(2, "w", closefd=False)), line_buffering=True)


class quiet_output:
    """Standard output, flushed at the end. A reader that went away ends the block, and no more.

    A character that the output's encoding lacks is written as an escape.
    """

    def __enter__(self) -> TextIO:
        out = sys.stdout
        if isinstance(out, io.TextIOWrapper):
            out.reconfigure(errors="backslashreplace")
        return out

    def __exit__(
        self, kind: type[BaseException] | None, error: BaseException | None, traceback: TracebackType | None
    ) -> bool:
        try:
            if error is None:
                sys.stdout.flush()
        except BrokenPipeError:
            _drop_output()
        if isinstance(error, BrokenPipeError):
            _drop_output()
            return True
        return False


def bytes_writer(out: TextIO) -> Callable[[bytes | memoryview], object]:
    """Writes UTF-8 to a text stream: as it is where that is the stream's encoding."""
    if isinstance(out, io.TextIOWrapper) and out.encoding.lower().replace("_", "-") in ("utf-8", "utf8"):
        out.flush()
        binary = out.buffer
        return lambda data: binary.write(data)
    return lambda data: out.write(str(data, "utf-8", "surrogatepass"))


def _flush() -> None:
    if sys.stdout is not None and not sys.stdout.closed:  # by whoever called
        sys.stdout.flush()


def _drop_output() -> None:
    """Lets what is still buffered go nowhere: the interpreter flushes once more when it ends."""
    try:
        null = os.open(os.devnull, os.O_WRONLY)
        os.dup2(null, sys.stdout.fileno())
        os.close(null)
    except (OSError, ValueError):
        pass


def _complain(error: OSError) -> None:
    from quillet.cli.progress import say
    from quillet.cli.show import printable

    name = os.fsdecode(error.filename) if isinstance(error.filename, (str, bytes)) else "standard output"
    say(f"{printable(name)}: {printable(error.strerror or str(error))}")
