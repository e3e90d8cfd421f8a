"""Calls that nobody means, and threads in each other's way: a small and fixed part of what hammer.py and
thread_hammer.py can make. Nothing crashes the interpreter.
"""

from __future__ import annotations

import subprocess
import sys
from pathlib import Path

import pytest

HAMMER = Path(__file__).with_name("hammer.py")


@pytest.mark.parametrize("seed", range(4))
def test_no_call_crashes(seed: int) -> None:
    done = subprocess.run([sys.executable, HAMMER, str(seed), "1500"], capture_output=True, text=True, timeout=320)
    assert (done.returncode, done.stdout, done.stderr) == (0, "held\n", "")


@pytest.mark.parametrize("seed", range(2))
def test_threads_share_what_there_is(seed: int) -> None:
    script = HAMMER.with_name("thread_hammer.py")
    done = subprocess.run([sys.executable, script, str(seed), "500"], capture_output=True, text=True, timeout=320)
    assert (done.returncode, done.stdout, done.stderr) == (0, "held\n", "")
