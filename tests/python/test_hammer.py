"""Calls that nobody means, a small and fixed part of what hammer.py can make: nothing crashes the interpreter."""

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
