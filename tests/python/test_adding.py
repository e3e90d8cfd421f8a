"""docs/adding-a-node-class.md carried out to the letter on a copy of the tree, which then passes its tests.

It compiles the core and the extension, without optimising: some minutes where nothing of it is in a compiler cache.
"""

from __future__ import annotations

import os
import re
import shutil
import subprocess
import sys
from pathlib import Path

import pytest

ROOT = Path(__file__).resolve().parent.parent.parent
PAGE = ROOT / "docs" / "adding-a-node-class.md"
DIFF = re.compile(r"^```diff\n--- (?P<path>\S+)\n(?P<lines>.*?)^```$", re.MULTILINE | re.DOTALL)
CORE_TESTS = ["vocabulary", "tree", "tree_accessors", "walker"]
PYTHON_TESTS = ["golden", "docs", "symbolinfo", "tarvex_module", "tarvex_nodes", "layout"]


def steps() -> list[tuple[str, str, str]]:
    """(file, lines as they are, lines to be), in the order of the page."""
    found = []
    for match in DIFF.finditer(PAGE.read_text()):
        lines = match["lines"].splitlines(keepends=True)
        before = "".join(line[1:] for line in lines if line[0] in " -")
        after = "".join(line[1:] for line in lines if line[0] in " +")
        found.append((match["path"], before, after))
    return found


def test_every_place_that_the_page_names_is_there_once() -> None:
    texts: dict[str, str] = {}
    for path, before, after in steps():
        text = texts.get(path) or (ROOT / path).read_text()
        assert text.count(before) == 1, f"{path}: {before}"
        texts[path] = text.replace(before, after)
    assert len(texts) > 10


def run(*command: str | Path, cwd: Path, env: dict[str, str] | None = None) -> None:
    done = subprocess.run(command, cwd=cwd, env=env, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True)
    assert done.returncode == 0, done.stdout[-4000:]


@pytest.mark.timeout(1800)
def test_a_class_and_a_kind_that_the_page_adds_pass_all_checks(tmp_path: Path) -> None:
    for tool in ("cmake", "ninja"):
        if shutil.which(tool) is None:
            pytest.skip(f"no {tool}")
    pytest.importorskip("nanobind")
    copy = tmp_path / "copy"
    shutil.copytree(ROOT, copy, ignore=shutil.ignore_patterns(".*", "build", "dist", "__pycache__"))
    for path, before, after in steps():
        file = copy / path
        file.write_text(file.read_text().replace(before, after))

    build = copy / "build"
    run("cmake", "-S", copy, "-B", build, "-G", "Ninja", "-DCMAKE_BUILD_TYPE=Debug", "-DQUILLET_TESTS=ON",
        f"-DPython_EXECUTABLE={sys.executable}", cwd=copy)  # fmt: skip
    run("ninja", "-C", build, "tarvex", *(f"{name}_test" for name in CORE_TESTS), cwd=copy)
    for name in CORE_TESTS:
        (test,) = build.rglob(f"{name}_test")
        run(test, cwd=copy)

    env = {**os.environ, "PYTHONPATH": str(build / "python"), "PYTHONDONTWRITEBYTECODE": "1"}
    pytest_here = [sys.executable, "-m", "pytest", "-q", "-p", "no:cacheprovider"]
    run(*pytest_here, "tests/python/test_golden.py", "--write-golden", cwd=copy, env=env)
    run(*pytest_here, *(f"tests/python/test_{name}.py" for name in PYTHON_TESTS), cwd=copy, env=env)
    case = (copy / "tests/golden/statements.txt").read_text().partition("=== asserted, with a message\n")[2]
    case = case.partition("\n=== ")[0]
    assert "CAssertStmt assert_stmt\n" in case
    assert re.search(r"^asserted +:x: +asserted$", case, re.MULTILINE)
