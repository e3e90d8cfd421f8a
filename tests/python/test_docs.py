"""The documents are true: examples show what the code does, links lead somewhere, commands exist."""

from __future__ import annotations

import importlib.util
import os
import re
import shutil
import subprocess
import sys
import warnings
from pathlib import Path
from types import ModuleType

import pytest

ROOT = Path(__file__).resolve().parent.parent.parent


def load_script(name: str) -> ModuleType:
    spec = importlib.util.spec_from_file_location(name, ROOT / "scripts" / f"{name}.py")
    assert spec is not None
    assert spec.loader is not None
    module = importlib.util.module_from_spec(spec)
    spec.loader.exec_module(module)
    return module


doc_examples = load_script("doc_examples")
DOCUMENTS = doc_examples.documents()
IDS = [path.name for path in DOCUMENTS]
SHOP = (ROOT / "examples" / "shop.py").read_text()


@pytest.mark.parametrize("path", DOCUMENTS, ids=IDS)
def test_examples_show_what_the_code_does(path: Path) -> None:
    assert doc_examples.stale_examples(path) == [], "./run docs rewrites them"


def test_there_are_examples_of_every_view() -> None:
    views = {match["view"] for path in DOCUMENTS for match in doc_examples.EXAMPLE.finditer(path.read_text())}
    assert views == set(doc_examples.VIEWS)


def test_no_example_is_overlooked_for_its_form() -> None:
    for path in DOCUMENTS:
        text = path.read_text()
        assert text.count("<!-- example:") == len(doc_examples.EXAMPLE.findall(text)), path.name


@pytest.mark.parametrize("path", DOCUMENTS, ids=IDS)
def test_links_lead_to_files(path: Path) -> None:
    prose = re.sub(r"^```.*?^```", "", path.read_text(), flags=re.DOTALL | re.MULTILINE)
    for target in re.findall(r"\]\(([^)#]+)(?:#[^)]*)?\)", prose):
        if "://" not in target:
            assert (path.parent / target).exists(), f"{path.name} links to {target}"


@pytest.mark.parametrize("path", DOCUMENTS, ids=IDS)
def test_commands_of_the_script_exist(path: Path) -> None:
    listed = subprocess.run([ROOT / "run", "help"], capture_output=True, text=True, check=True).stdout
    known = set(re.findall(r"^  (\w+) ", listed, re.MULTILINE))
    assert set(re.findall(r"\./run (\w+)", path.read_text())) <= known


def test_the_readme_shows_what_the_demo_analyses() -> None:
    shown = doc_examples.EXAMPLE.search((ROOT / "README.md").read_text())
    assert shown["source"] == (ROOT / shown["file"]).read_text()
    assert f"analyze {shown['file']}" in (ROOT / "run").read_text()


README_BLOCKS = re.findall(r"^```(sh|python)\n(.*?)^```$", (ROOT / "README.md").read_text(), re.MULTILINE | re.DOTALL)


@pytest.mark.parametrize("language", ["sh", "python"])
def test_what_the_readme_shows_can_be_pasted(language: str, tmp_path: Path) -> None:
    shutil.copytree(ROOT / "examples", tmp_path / "examples")
    command = tmp_path / "bin" / "quillet"
    command.parent.mkdir()
    command.write_text(f'#!/bin/sh\nexec "{sys.executable}" -m quillet "$@"\n')
    command.chmod(0o755)
    env = {**os.environ, "PATH": f"{command.parent}{os.pathsep}{os.environ['PATH']}"}
    blocks = [text for marked, text in README_BLOCKS if marked == language]
    for text in blocks:
        if text == SHOP:  # the source that the first example analyses
            continue
        shell = ["sh", "-ec", text] if language == "sh" else [sys.executable, "-c", text]
        done = subprocess.run(shell, cwd=tmp_path, env=env, capture_output=True, text=True)
        if "No module named 'pyarrow'" in done.stderr:
            warnings.warn("an example was not run: no pyarrow", stacklevel=1)
            continue
        assert done.returncode == 0, f"{text}\n{done.stderr}"
        assert done.stdout, text
    assert len(blocks) > 1


PROGRAM = re.compile(r"^```python\n((?:import|from) [^`]*?)^```$", re.MULTILINE)
# They read what their reader has.
ENGINES = ("pyspark", "ray", "dask", "sources.parquet")


@pytest.mark.parametrize("path", [path for path in DOCUMENTS if path.name != "README.md"], ids=lambda path: path.name)
def test_programs_in_the_documents_can_be_pasted(path: Path) -> None:
    for text in PROGRAM.findall(path.read_text()):
        if "quillet" not in text or any(engine in text for engine in ENGINES):
            continue
        done = subprocess.run([sys.executable, "-c", text], cwd=ROOT, capture_output=True, text=True)
        if missing := re.search(r"No module named '(pyarrow|polars|duckdb)'", done.stderr):
            warnings.warn(f"an example of {path.name} was not run: no {missing[1]}", stacklevel=1)
            continue
        assert done.returncode == 0, f"{text}\n{done.stderr}"
        assert done.stdout, text


def test_every_record_kind_is_documented() -> None:
    from quillet import RecordKind

    text = (ROOT / "docs" / "records.md").read_text()
    assert [kind.value for kind in RecordKind if f"`{kind.value}`" not in text] == []


def test_every_prefix_that_the_walkers_write_is_documented() -> None:
    rows = (ROOT / "core/vocabulary/kinds.def").read_text().split("// What consumers")[0]
    names = re.findall(r"^QUILLET_INFO_KIND\((\w+),", rows, re.MULTILINE)
    text = (ROOT / "docs" / "records.md").read_text()
    assert [name for name in names if f"`k{name}Prefix`" not in text] == []
    assert len(names) > 10
