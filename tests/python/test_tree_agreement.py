"""quillet's statements and expressions are those of `ast`, over a sample of the running Python's own library.

QUILLET_FULL=1 takes the whole libraries of all Pythons that are found.
"""

from __future__ import annotations

import os
import sys
from collections.abc import Iterator
from pathlib import Path

import pytest

from quillet.tarvex import _host
from survey import Library, libraries, library_of
from tree_agreement import Comparison, Report, Tree, compare_library
from tree_oracle import RECURSION_LIMIT, nodes_of

FULL = os.environ.get("QUILLET_FULL") == "1"
EACH_NTH_FILE = 80

# The files of the library that ask most of a reader, where they are there.
TRICKY = """
_pydecimal.py dataclasses.py typing.py test/test_grammar.py test/test_named_expressions.py test/test_patma.py
test/test_type_params.py test/test_type_aliases.py test/test_type_comments.py test/test_typing.py test/test_fstring.py
test/test_syntax.py test/test_genexps.py test/test_unicode_identifiers.py test/test_keywordonlyarg.py
test/test_positional_only_arg.py test/test_coroutines.py test/test_except_star.py test/test_genericalias.py
test/test_source_encoding.py test/test_unparse.py
""".split()


@pytest.fixture(autouse=True)
def _deep_trees() -> Iterator[None]:
    limit = sys.getrecursionlimit()
    sys.setrecursionlimit(RECURSION_LIMIT)
    yield
    sys.setrecursionlimit(limit)


def sample_of(library: Library) -> list[Path]:
    tricky = [path for name in TRICKY if (path := library.root / name).exists()]
    return tricky + [path for path in library.files(EACH_NTH_FILE) if path not in tricky]


def check(report: Report, nodes: int) -> None:
    assert report.examples == {}
    assert report.files > 15
    assert report.nodes >= nodes
    assert report.occurrences > 10_000


def test_the_library_is_read_alike() -> None:
    library = library_of(sys.executable)
    assert library is not None
    check(compare_library(library, sample_of(library)), 50_000)


@pytest.mark.parametrize("version", [(2, 7), *((3, minor) for minor in range(6, 15))], ids=lambda v: f"{v[0]}.{v[1]}")
def test_all_libraries_are_read_alike(version: tuple[int, int]) -> None:
    if not FULL:
        pytest.skip("QUILLET_FULL=1 compares whole libraries")
    library = libraries().get(version)
    if library is None:
        pytest.skip("this Python is not here")
    check(compare_library(library, library.files()), 50_000 if version >= (3, 10) else 0)


# ---- the comparison finds what is wrong ----

SOURCE = """
import os.path as path
class Shop(Base, metaclass=Meta):
    limit: "list[int]" = 10
    def total(self, *items, tax=0) -> None:
        if self.a < 1 and f"{items!r}":
            global spent
        else:
            spent = sum(item.price for item in items if item)
        return lambda: spent + self.limit * 2
"""


@pytest.mark.parametrize(
    ("old", "new"),
    [
        ("os.path", "os .path"),
        ("as path", "as part"),
        ("Meta", "Metas"),
        ("list[int]", "list[str]"),
        ("10", "1."),
        ("*items", "items"),
        ("tax=0", "tax"),
        ("-> None", ""),
        ("if self", "elif self"),
        ("<", "<="),
        ("and", "or "),
        ("!r", "+r"),
        ("else", "elif x"),
        ("spent = sum", "spent += sum"),
        ("for item", "for items"),
        ("if item", ""),
        ("lambda:", "lambda: lambda:"),
        ("+", "-"),
        ("* 2", "** 2"),
        ("return", "await"),
        ("(item.", "(item.a."),
        ("Base,", "(Base),"),
        ("\n    def", "\n    async def"),
        ("spent\n        else", "spent;\n        else"),
    ],
)
def test_a_difference_is_found(old: str, new: str, monkeypatch: pytest.MonkeyPatch) -> None:
    """What another source says is not taken for what this one says."""
    source = SOURCE.encode()
    version = sys.version_info[:2]
    report = Report("")
    said = nodes_of(source, source)
    assert said is not None
    Comparison(report, "shop.py", source).run(said, Tree(source, version))
    assert report.examples == {}
    changed = SOURCE.replace(old, new, 1).encode()
    assert changed != source
    Comparison(report, "shop.py", source).run(said, Tree(changed, version))
    is_extent_alone = old.startswith(("os.path", "Base", "spent\n"))
    assert report.differences.total() > 0
    if is_extent_alone:
        assert all(what.startswith(("begin of", "end of", "detail of")) for what in report.differences)


def test_a_name_that_is_not_found_is_told(monkeypatch: pytest.MonkeyPatch) -> None:
    lines = _host.SyntaxLines((3, 13, 0), b"a\n")
    monkeypatch.setattr(_host, "SyntaxLines", lambda version, source: lines + "N 0 1 0\n")
    report = Report("")
    Comparison(report, "a.py", b"a\n").run(None, Tree(b"a\n", (3, 13)))
    assert list(report.differences) == ["a name is not found, flags 0"]


def test_what_is_broken_is_told() -> None:
    """Nothing that `ast` takes is broken, and what is left over of it is."""
    tree = Tree(b"x.\nf(a b)\nx y\n", (3, 13))
    assert [stmt.kind for stmt in tree.stmts] == ["Module", "Expression", "Expression", "Expression", "Broken"]
    assert [bool(stmt.flags & 16) for stmt in tree.stmts] == [False, True, True, True, True]
