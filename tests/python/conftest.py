"""What all tests of the package share: scripts and benchmarks as modules, and the flag that rewrites golden files."""

from __future__ import annotations

import os
import shutil
import signal
import subprocess
import sys
from pathlib import Path

import pytest

ROOT = Path(__file__).resolve().parent.parent.parent
sys.path.insert(0, str(ROOT / "scripts"))
sys.path.append(str(ROOT))

# A run behind nohup or "&" may have been started with interrupts ignored, and so would be what the tests
# start, some of which they interrupt.
if signal.getsignal(signal.SIGINT) == signal.SIG_IGN:
    signal.signal(signal.SIGINT, signal.default_int_handler)


@pytest.fixture(scope="session")
def as_anyone() -> list[str]:
    """What stands in front of a command that may read and write only what the bits of files let its user."""
    if not hasattr(os, "geteuid") or os.geteuid() != 0:
        return []
    command = ["setpriv", "--inh-caps=-all", "--bounding-set=-all"]
    if shutil.which("setpriv") is None or subprocess.run([*command, "true"], check=False).returncode != 0:
        pytest.skip("the superuser may read and write everything")
    return command


def pytest_addoption(parser: pytest.Parser) -> None:
    parser.addoption("--write-golden", action="store_true", help="rewrite tests/golden from what the code does")
