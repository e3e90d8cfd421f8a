"""Inferred types against those that programs have when they run."""

from __future__ import annotations

from pathlib import Path

import pytest

from quillet import Workspace
from types_at_run_time import Unlike

_PROGRAMS = sorted((Path(__file__).parent / "run_time_types").glob("*.py"))


@pytest.mark.parametrize("path", _PROGRAMS, ids=lambda path: path.stem)
def test_types_are_those_at_run_time(path: Path, tmp_path: Path) -> None:
    pytest.importorskip("typeshed_client")
    copy = tmp_path / path.name  # beside no other program
    copy.write_bytes(path.read_bytes())
    places, mistakes = Unlike(copy, Workspace(tmp_path))
    assert places > 50
    assert mistakes == []
