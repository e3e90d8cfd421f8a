"""What is installed: every module imports, the data files lie beside them, types are declared."""

from __future__ import annotations

import importlib
import importlib.metadata
import subprocess
import sys
from pathlib import Path

import pytest

import quillet
from quillet import cli

PACKAGE = Path(quillet.__file__).parent
MODULES = [
    "_fastaccess",
    "_batch",
    "_keywords",
    "_records",
    "_source",
    "_trees",
    "cli",
    "config",
    "host",
    "logicalinspect",
    "logicalline",
    "optpgen",
    "reflect",
    "strutils",
    "symbolinfo",
    "tarvex",
    "utils",
]


@pytest.mark.parametrize("name", MODULES)
def test_each_module_is_importable_on_its_own(name: str) -> None:
    subprocess.run([sys.executable, "-c", f"import quillet.{name}"], check=True)


@pytest.mark.parametrize("name", MODULES)
def test_each_module_says_what_it_is(name: str) -> None:
    assert (importlib.import_module(f"quillet.{name}").__doc__ or "").strip()


@pytest.mark.parametrize("name", ["Python-Grammar-2.7", "Python-Grammar-2.7-print-function", "Python-Grammar-3.8"])
def test_the_grammar_files_are_installed(name: str) -> None:
    from quillet import config

    path = Path(config.GetNorvaFilename(f"resources/pgen-grammars/{name}"))
    assert path.is_absolute()
    assert "file_input:" in path.read_text(encoding="utf-8")


def test_types_are_declared() -> None:
    assert (PACKAGE / "py.typed").is_file()
    assert (PACKAGE / "tarvex.pyi").is_file()


def test_the_package_is_installed_as_the_version_that_it_says() -> None:
    assert importlib.metadata.version("quillet") == quillet.__version__


def test_the_command_is_installed() -> None:
    scripts = importlib.metadata.entry_points(group="console_scripts", name="quillet")
    assert [script.load() for script in scripts] == [cli.main]


def test_the_man_page_is_installed_beside_the_command() -> None:
    files = importlib.metadata.files("quillet") or []
    assert [path.name for path in files if path.name.startswith("quillet.1")] == ["quillet.1"]


def test_every_public_name_is_there() -> None:
    assert all(hasattr(quillet, name) for name in quillet.__all__)
    with pytest.raises(AttributeError, match="no_such"):
        quillet.no_such  # noqa: B018


def test_a_second_interpreter_cannot_load_the_engine() -> None:
    script = """
import sys
try:
    import _interpreters
    run = lambda code: _interpreters.exec(_interpreters.create("legacy"), code)
except ImportError:
    import _xxsubinterpreters as _interpreters
    run = lambda code: _interpreters.run_string(_interpreters.create(isolated=False), code)
import quillet.tarvex
problem = run('''
try:
    import quillet.tarvex
except ImportError:
    pass
else:
    raise SystemError("it was loaded")
''')
assert problem is None, problem
"""
    subprocess.run([sys.executable, "-c", script], check=True)
