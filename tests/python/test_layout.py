"""The folders of the core stand in the order of the data, and a folder includes only what stands before it."""

import re
from pathlib import Path

ROOT = Path(__file__).parents[2]
INCLUDE = re.compile(r'^\s*#\s*include\s*(["<])([^">]+)[">]', re.MULTILINE)


def stages() -> list[str]:
    """The folders of the core in the order in which core/CMakeLists.txt names them."""
    listed = (ROOT / "core/CMakeLists.txt").read_text()
    return re.findall(r"^quillet_library\((\w+)", listed, re.MULTILINE)


def included(folder):
    """(file, quote, path) of each include in the files of a folder."""
    for path in sorted((ROOT / folder).rglob("*")):
        if path.suffix in (".cc", ".h", ".def"):
            for quote, name in INCLUDE.findall(path.read_text()):
                yield path.relative_to(ROOT), quote, name


def test_every_folder_of_the_core_is_a_stage():
    assert stages() == list(dict.fromkeys(stages()))
    assert {path.name for path in (ROOT / "core").iterdir() if path.is_dir()} == set(stages())


def test_a_stage_includes_only_what_stands_before_it():
    order = stages()
    found = 0
    wrong = []
    for index, stage in enumerate(order):
        for path, quote, name in included(f"core/{stage}"):
            if quote == '"':
                found += 1
                if name.split("/")[0] not in order[: index + 1]:
                    wrong.append(f"{path} includes {name}")
    assert not wrong
    assert found > len(order)


def test_the_core_sees_no_interpreter():
    wrong = [
        f"{path} includes {name}"
        for path, _, name in included("core")
        if re.match(r"Python\.h|nanobind|bindings/", name)
    ]
    assert not wrong


def test_no_binding_is_longer_than_a_reader_can_hold() -> None:
    lengths = {path.name: path.read_text().count("\n") for path in (ROOT / "bindings").iterdir()}
    assert len(lengths) > 20
    assert {name: length for name, length in lengths.items() if length > 400} == {}


def test_the_documents_name_the_stages_in_their_order() -> None:
    page = (ROOT / "docs/architecture.md").read_text()
    listed = page.partition("a folder includes only what stands before it: ")[2].partition("(")[0]
    assert re.findall(r"`(\w+)`", listed) == stages()
    table = (ROOT / "README.md").read_text().partition("| Folder | |")[2].partition("| `bindings/`")[0]
    rows = [row.partition(" | ")[0] for row in table.splitlines() if row.startswith("| `core/")]
    named = re.findall(r"`(?:core/)?(\w+)/", " ".join(rows[1:]))
    assert named == stages()
