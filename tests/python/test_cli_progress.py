"""The line that says how far a run is: where it stands, how wide it is, that it goes."""

from __future__ import annotations

import fcntl
import io
import os
import pty
import re
import struct
import termios
from collections.abc import Callable
from typing import TextIO

import pytest

from quillet.cli import progress
from quillet.cli.progress import Progress, line_of, say


def drawn(monkeypatch: pytest.MonkeyPatch, columns: int, work: Callable[[], None]) -> str:
    """What a terminal of a width gets on standard error."""
    main, side = pty.openpty()
    fcntl.ioctl(side, termios.TIOCSWINSZ, struct.pack("HHHH", 24, columns, 0, 0))
    monkeypatch.setenv("TERM", "xterm")
    monkeypatch.setattr(progress, "_DELAY", 0.0)
    monkeypatch.setattr(progress, "_INTERVAL", 0.0)
    with os.fdopen(side, "w") as terminal:
        monkeypatch.setattr("sys.stderr", terminal)
        work()
        terminal.flush()
        os.set_blocking(main, False)
        output = b""
        while True:
            try:
                chunk = os.read(main, 65536)
            except OSError:
                break
            output += chunk
    os.close(main)
    return output.decode().replace("\r\n", "\n")


def screen(output: str) -> list[str]:
    """The lines that stand on a terminal in the end."""
    lines = [""]
    column = 0
    for part in re.split(r"(\n|\r|\x1b\[K)", output):
        if part == "\n":
            lines.append("")
            column = 0
        elif part == "\r":
            column = 0
        elif part == "\x1b[K":
            lines[-1] = lines[-1][:column]
        else:
            lines[-1] = lines[-1][:column] + part + lines[-1][column + len(part) :]
            column += len(part)
    return lines


def count_to_ten() -> None:
    with Progress("analysing", 10) as shown:
        for _ in range(10):
            shown.advance()


@pytest.mark.parametrize("columns", [5, 10, 20, 40, 80, 300])
def test_no_line_is_wider_than_the_terminal(monkeypatch: pytest.MonkeyPatch, columns: int) -> None:
    output = drawn(monkeypatch, columns, count_to_ten)
    lines = re.findall(r"\r([^\r\x1b]*)", output)
    assert len(lines) == 11
    assert max(map(len, lines)) < columns
    assert "\n" not in output


def test_it_is_gone_at_the_end(monkeypatch: pytest.MonkeyPatch) -> None:
    output = drawn(monkeypatch, 80, count_to_ten)
    assert "10/10" in output
    assert output.endswith("\r\x1b[K")


def test_it_is_gone_behind_an_exception(monkeypatch: pytest.MonkeyPatch) -> None:
    def interrupted() -> None:
        with Progress("analysing", 10) as shown:
            shown.advance()
            raise KeyboardInterrupt

    def work() -> None:
        with pytest.raises(KeyboardInterrupt):
            interrupted()

    assert drawn(monkeypatch, 80, work).endswith("\r\x1b[K")


def test_a_message_has_a_line_of_its_own(monkeypatch: pytest.MonkeyPatch) -> None:
    def work() -> None:
        with Progress("analysing", 10) as shown:
            shown.advance()
            say("a.py: gone")
            shown.advance()

    assert screen(drawn(monkeypatch, 80, work)) == ["quillet: a.py: gone", ""]


def test_parts_have_counts_of_their_own(monkeypatch: pytest.MonkeyPatch) -> None:
    def work() -> None:
        with Progress("reading", 2) as shown:
            shown.advance()
            shown.begin("sorting")
            shown.advance(7)

    output = drawn(monkeypatch, 80, work)
    assert "1/2" in output
    assert "\rsorting  7\x1b[K" in output


def test_a_short_run_shows_nothing(monkeypatch: pytest.MonkeyPatch) -> None:
    def work() -> None:
        monkeypatch.setattr(progress, "_DELAY", 3600.0)
        count_to_ten()

    assert drawn(monkeypatch, 80, work) == ""


@pytest.mark.parametrize("stream", [None, io.StringIO()])
def test_there_is_none_without_a_terminal(monkeypatch: pytest.MonkeyPatch, stream: TextIO | None) -> None:
    monkeypatch.setattr(progress, "_DELAY", 0.0)
    monkeypatch.setattr("sys.stderr", stream)
    count_to_ten()
    say("still heard")
    assert not isinstance(stream, io.StringIO) or stream.getvalue() == "quillet: still heard\n"


def test_there_is_none_where_the_data_goes_to_the_terminal(monkeypatch: pytest.MonkeyPatch) -> None:
    def work() -> None:
        with Progress("analysing", 10, wanted=False) as shown:
            shown.advance()

    assert drawn(monkeypatch, 80, work) == ""


def test_what_matters_least_goes_first() -> None:
    assert line_of("analysing", 5, 10, 40) == "analysing  [#######-------]   5/10   50%"
    assert line_of("analysing", 5, 10, 25) == "analysing   5/10   50%"
    assert line_of("analysing", 5, 10, 16) == "analysing   50%"
    assert line_of("analysing", 5, 10, 4) == "50%"
    assert line_of("analysing", 5, 10, 2) == ""
    assert line_of("analysing", 0, 0, 80).endswith("0/0  100%")
    assert line_of("looking", 5, None, 80) == "looking  5"
