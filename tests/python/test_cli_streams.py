"""How commands end where streams are closed or full, readers go away and people interrupt: never by a traceback."""

from __future__ import annotations

import os
import signal
import subprocess
import sys
from pathlib import Path

import pytest

ENVIRONMENT = {**os.environ, "PYTHONUTF8": "1", "NO_COLOR": "1"}
COMMAND = f"{sys.executable} -m quillet"
needs_full = pytest.mark.skipif(not os.path.exists("/dev/full"), reason="there is no /dev/full")


def shell(line: str, cwd: Path) -> subprocess.CompletedProcess[bytes]:
    return subprocess.run(
        ["sh", "-c", line.replace("quillet", COMMAND)],
        capture_output=True,
        cwd=cwd,
        env=ENVIRONMENT,
        timeout=120,
        check=False,
    )


@pytest.fixture
def folder(tmp_path: Path) -> Path:
    (tmp_path / "a.py").write_text("total = 1\n" * 20)
    assert shell("quillet index -q .", tmp_path).returncode == 0
    return tmp_path


SAYING = ["analyze a.py", "tree a.py", "find total", "find total --json", "stats", "defs a.py"]
SAYING += ["export jsonl", "--help", "completion bash"]


@needs_full
@pytest.mark.parametrize("line", SAYING)
def test_a_full_device_is_told_in_one_line(line: str, folder: Path) -> None:
    result = shell(f"quillet {line} > /dev/full", folder)
    assert result.returncode == 2
    assert result.stderr == b"quillet: standard output: No space left on device\n"


@pytest.mark.parametrize("line", SAYING)
def test_a_closed_output_is_told_in_one_line(line: str, folder: Path) -> None:
    result = shell(f"quillet {line} >&-", folder)
    assert result.returncode == 2
    assert result.stderr == b"quillet: standard output: Bad file descriptor\n"


@pytest.mark.parametrize("line", SAYING)
def test_closed_inputs_and_messages_change_nothing(line: str, folder: Path) -> None:
    result = shell(f"quillet {line} <&- 2>&-", folder)
    assert result.returncode == 0
    assert result.stdout == shell(f"quillet {line}", folder).stdout


def test_a_closed_stream_is_no_place_for_an_index(tmp_path: Path) -> None:
    (tmp_path / "a.py").write_text("total = 1\n")
    assert shell("quillet index . <&- >&- 2>&-", tmp_path).returncode == 0
    assert b"a.py" in shell("quillet find total", tmp_path).stdout


def test_a_closed_input_is_a_file_that_cannot_be_read(tmp_path: Path) -> None:
    result = shell("quillet analyze - <&-", tmp_path)
    assert result.returncode == 1
    assert b"Bad file descriptor" in result.stderr
    assert b"Traceback" not in result.stderr


@pytest.mark.parametrize("line", SAYING)
def test_a_reader_that_goes_away_is_no_fault(line: str, folder: Path) -> None:
    result = shell(f"(quillet {line}; echo $? >&2) | true", folder)
    # What click itself writes ends with 1.
    assert result.stderr == (b"1\n" if line in ("--help", "completion bash") else b"0\n")


@pytest.mark.parametrize("name", [b"a\xff", b".\xff"])
def test_a_name_that_is_no_text_is_told(name: bytes, folder: Path) -> None:
    result = subprocess.run(
        [sys.executable, "-m", "quillet", "find", name], capture_output=True, cwd=folder, timeout=60, check=False
    )
    assert result.returncode == 2
    assert result.stderr.startswith(b"quillet: ")
    assert b"is no UTF-8" in result.stderr


@pytest.mark.parametrize("line", ["analyze a.py -j 1", "index . -j 100000", "analyze . --jobs 100000"])
def test_too_many_threads_are_wrong_usage(line: str, folder: Path) -> None:
    result = shell(f"quillet {line}", folder)
    assert result.returncode == 2
    assert b"Traceback" not in result.stderr


@pytest.mark.parametrize("line", [["analyze", "-"], ["analyze", "pipe"], ["tree", "-"], ["tree", "pipe"]])
def test_an_interrupt_ends_with_130(line: list[str], tmp_path: Path) -> None:
    os.mkfifo(tmp_path / "pipe")
    code = (
        "import signal, sys, os, threading\n"
        "signal.signal(signal.SIGINT, signal.default_int_handler)\n"
        "import quillet.cli, quillet.cli.commands, quillet.cli.analyze, quillet.cli.tree\n"
        "threading.Timer(1.0, os.kill, (os.getpid(), signal.SIGINT)).start()\n"
        f"quillet.cli.main({line!r})\n"
    )
    with subprocess.Popen(
        [sys.executable, "-c", code],
        stdin=subprocess.PIPE,
        stdout=subprocess.PIPE,
        stderr=subprocess.PIPE,
        cwd=tmp_path,
        env=ENVIRONMENT,
    ) as process:
        assert process.stderr is not None
        assert process.wait(timeout=60) == 128 + signal.SIGINT
        assert process.stderr.read().strip() == b""
