"""The table [tool.quillet]: where it is looked for, what it may say, and how mistakes in it are told."""

from __future__ import annotations

from pathlib import Path

import pytest

from quillet.settings import DIAGNOSTICS, Settings, SettingsError, load_settings


def write(folder: Path, text: str) -> str:
    folder.mkdir(parents=True, exist_ok=True)
    path = folder / "pyproject.toml"
    path.write_text(text, encoding="utf-8")
    return str(path)


def test_without_a_table_the_folder_is_the_program(tmp_path: Path) -> None:
    assert load_settings(tmp_path) == Settings((str(tmp_path),))
    write(tmp_path, '[project]\nname = "quillet-user"\n')
    assert load_settings(tmp_path) == Settings((str(tmp_path),))


def test_the_nearest_file_with_the_table_counts(tmp_path: Path) -> None:
    (tmp_path / "src").mkdir()
    (tmp_path / ".venv").mkdir()
    outer = write(
        tmp_path,
        '[tool.quillet]\nroots = ["src", "."]\nexclude = ["build/"]\nenvironment = ".venv"\nversion = "2.7"\n'
        'diagnostics = ["syntax"]\ncertainty = "likely"\n',
    )
    write(tmp_path / "a" / "b", "[tool.other]\nx = 1\n")
    found = load_settings(tmp_path / "a" / "b")
    assert found == Settings(
        roots=(str(tmp_path / "src"), str(tmp_path)),
        exclude=("build/",),
        environment=str(tmp_path / ".venv"),
        version=(2, 7),
        diagnostics=frozenset(["syntax"]),
        certainty="likely",
        file=outer,
    )
    inner = write(tmp_path / "a" / "b", "tool.quillet.diagnostics = true\n")
    assert load_settings(tmp_path / "a" / "b") == Settings((str(tmp_path / "a" / "b"),), file=inner)


@pytest.mark.parametrize(
    ("text", "line", "said"),
    [
        ("[tool.quillet]\n\nversion = 3.12\n", 3, 'must be a version in quotes, "2.7" or "3.x"'),
        ('x = 1\n[tool.quillet]\nroot = "a"\n', 3, "root is unknown; there are roots, exclude,"),
        ("[tool.quillet]\nroots = []\n", 2, "must be a list of folders"),
        ('[tool.quillet]\nroots = ["gone"]\n', 2, "gone, which is not there"),
        ('[tool.quillet]\nexclude = "build"\n', 2, "must be a list of patterns"),
        ('[tool.quillet]\nenvironment = "gone"\n', 2, "make the environment or leave the setting out"),
        (
            '[tool.quillet]\ndiagnostics = ["style"]\n',
            2,
            'must be true, false, or a list of those to show, of "syntax"',
        ),
        ("tool.quillet.certainty = 1\n", 1, "must be one of 'certain', 'likely', 'by name'"),
        ("[tool]\nquillet = 1\n", 2, "must be a table, written [tool.quillet]"),
        ('[project]\nname = "quillet"\nversion = \n', 3, "it must be written as TOML"),
    ],
)
def test_mistakes_name_the_file_the_line_and_the_remedy(tmp_path: Path, text: str, line: int, said: str) -> None:
    path = write(tmp_path, text)
    with pytest.raises(SettingsError) as caught:
        load_settings(tmp_path)
    assert str(caught.value).startswith(f"{path}:{line}: ")
    assert said in str(caught.value)


def test_a_client_may_say_otherwise(tmp_path: Path) -> None:
    settings = load_settings(tmp_path)
    changed = settings.updated({"diagnostics": False, "certainty": "certain"}, str(tmp_path), "the editor's settings")
    assert (changed.diagnostics, changed.certainty, changed.roots) == (frozenset(), "certain", settings.roots)
    assert settings.diagnostics == frozenset(DIAGNOSTICS)
    assert [changed.admits(word) for word in ("certain", "likely", "by name")] == [True, False, False]
    with pytest.raises(SettingsError, match=r"^the editor's settings: version must be"):
        settings.updated({"version": 3}, str(tmp_path), "the editor's settings")


def test_a_workspace_is_made_of_them(tmp_path: Path) -> None:
    write(tmp_path, '[tool.quillet]\nexclude = ["*_pb2.py", "!kept_pb2.py"]\nversion = "2.7"\n')
    for name in ("a.py", "b_pb2.py", "kept_pb2.py"):
        (tmp_path / name).write_text("total = 1\n")
    workspace = load_settings(tmp_path).workspace()
    assert sorted(Path(symbol.path).name for symbol in workspace.symbols("total")) == ["a.py", "kept_pb2.py"]
    assert workspace.version == (2, 7)
    (tmp_path / "a.py").write_text("print 'x'\n")
    assert workspace.problems(tmp_path / "a.py") == []
    (tmp_path / "c.py").write_text("print 'x' x\n")
    assert [(found.line, found.code) for found in workspace.problems(tmp_path / "c.py")][:1] == [(1, "syntax")]
