"""What all tests of the package share: the scripts as modules, and the flag that rewrites golden files."""

from __future__ import annotations

import sys
from pathlib import Path

import pytest

sys.path.insert(0, str(Path(__file__).resolve().parent.parent.parent / "scripts"))


def pytest_addoption(parser: pytest.Parser) -> None:
    parser.addoption("--write-golden", action="store_true", help="rewrite tests/golden from what the code does")
