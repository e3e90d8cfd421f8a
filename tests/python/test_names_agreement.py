"""What quillet says of names is what `symtable` and `ast` say, over a sample of the running Python's own library.

The sources in tests/names hold what libraries hardly do: each kind of scope in each other, names in every place.
QUILLET_FULL=1 takes the whole libraries of all Pythons that are found; docs/names-agreement.md shows the counts.
"""

from __future__ import annotations

import os
import sys
from pathlib import Path

import pytest

import names_agreement
from names_agreement import DOCUMENT, VERSIONS, Report, Rule, compare_library
from survey import Library, libraries, library_of

FULL = os.environ.get("QUILLET_FULL") == "1"
EACH_NTH_FILE = 40

# With the first version that takes them.
SOURCES = {
    "places.py": (3, 8),
    "scopes.py": (3, 8),
    "future_annotations.py": (3, 8),
    "type_parameters.py": (3, 12),
    "python_2.py": (2, 7),
}
SOURCES_FOLDER = Path(__file__).resolve().parent.parent / "names"

# The files of the library that ask most of a reader of names, where they are there.
TRICKY = """
_collections_abc.py _pydecimal.py argparse.py contextlib.py dataclasses.py enum.py typing.py inspect.py symtable.py
asyncio/base_events.py test/test_grammar.py test/test_scope.py test/test_named_expressions.py test/test_patma.py
test/test_type_params.py test/test_type_aliases.py test/test_type_comments.py test/test_typing.py test/test_fstring.py
test/test_symtable.py test/test_syntax.py test/test_super.py test/test_listcomps.py test/test_genexps.py
test/test_unicode_identifiers.py test/test_future.py test/test_annotations.py test/test_generators.py
test/test_keywordonlyarg.py test/test_positional_only_arg.py test/test_global.py test/test_coroutines.py
test/test_dictcomps.py test/test_source_encoding.py test/test_peepholer.py test/test_lib2to3.py
""".split()


def sample_of(library: Library) -> list[Path]:
    tricky = [path for name in TRICKY if (path := library.root / name).exists()]
    return tricky + [path for path in library.files(EACH_NTH_FILE) if path not in tricky]


def check(report: Report) -> None:
    assert report.left == {}
    assert report.files > 30
    assert report.tallies["names"].compared > 10_000
    assert report.tallies["questions"].compared > 10_000


def test_the_library_is_bound_alike() -> None:
    if sys.version_info[:2] not in VERSIONS:
        pytest.skip(f"what symtable of {sys.version_info[0]}.{sys.version_info[1]} says is not compared")
    library = library_of(sys.executable)
    assert library is not None
    check(compare_library(library, sample_of(library)))


@pytest.mark.parametrize("version", VERSIONS, ids=lambda version: ".".join(map(str, version)))
def test_what_libraries_hardly_hold_is_bound_alike(version: tuple[int, int]) -> None:
    library = libraries().get(version)
    if library is None:
        pytest.skip("this Python is not here")
    files = [SOURCES_FOLDER / name for name, first in SOURCES.items() if first[0] == version[0] and first <= version]
    report = compare_library(library, files)
    assert report.left == {}
    assert (report.files, report.refused) == (len(files), 0)


@pytest.mark.parametrize("version", VERSIONS, ids=lambda version: ".".join(map(str, version)))
def test_all_libraries_are_bound_alike(version: tuple[int, int]) -> None:
    if not FULL:
        pytest.skip("QUILLET_FULL=1 compares whole libraries")
    library = libraries().get(version)
    if library is None:
        pytest.skip("this Python is not here")
    check(compare_library(library, library.files()))


def test_every_rule_has_its_reason() -> None:
    text = DOCUMENT.read_text(encoding="utf-8")
    assert [rule for rule in Rule if f"### {rule.value}\n" not in text] == []


# ---- the comparison finds what is wrong ----

SOURCE = """
import os.path as path
class Shop(Base, metaclass=Meta):
    limit: int = 10
    def total(self, *items, tax=0):
        global spent
        spent = sum(item.price for item in items)
        return lambda: spent + self.limit
"""


@pytest.mark.parametrize(
    ("old", "new", "what"),
    [
        ("global spent", "spent; spent", "questions"),
        ("tax=0", "tax, z", "symbols"),
        ("item.price", "item_price", "names"),
        ("sum(", "sum, (", "names"),
        ("Base,", "mix=1,", "names"),
        ("lambda: spent", "spent", "scopes"),
        ("def total", "def other", "names"),
        ("10", "10; del limit", "names"),
    ],
)
def test_a_difference_is_found(old: str, new: str, what: str, tmp_path: Path, monkeypatch: pytest.MonkeyPatch) -> None:
    """What another source says is not taken for what this one says."""
    library = library_of(sys.executable)
    assert library is not None
    path = tmp_path / "shop.py"
    path.write_text(SOURCE)
    if library.version in VERSIONS:
        assert compare_library(library, [path]).left == {}
    bind = names_agreement.bind
    changed = SOURCE.replace(old, new)
    assert changed != SOURCE
    monkeypatch.setattr(names_agreement, "bind", lambda source, version: bind(changed, version=version))
    report = compare_library(library, [path])
    assert report.tallies[what].left > 0
