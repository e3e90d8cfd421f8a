"""Every statement of the standard libraries, tests included, is served, but for the kinds that are rejected on purpose.

The library of the running Python is read whole, those of the other Pythons of this machine in a sample;
QUILLET_FULL=1 reads all of them whole. A version that is not installed is skipped.
"""

from __future__ import annotations

import os
import re
import sys
from functools import cache
from pathlib import Path

import pytest

import rejections
from quillet import analyze
from survey import DOCUMENT, NOT_THE_LIBRARY, Findings, Library, libraries, survey

FULL = os.environ.get("QUILLET_FULL") == "1"
HERE = sys.version_info[:2]
VERSIONS = [(2, 7), *((3, minor) for minor in range(6, max(14, HERE[1] + 1)))]

#: The kinds of rejected statements, and the first version whose code can hold them.
ALLOWED = {
    "sequence pattern without brackets": (3, 10),
    "pattern in round brackets, or `()`": (3, 10),
    "strings side by side in a pattern": (3, 10),
    "`with` around what cannot stand without its brackets": (2, 7),
    "`async with` with its items in brackets": (3, 9),
    "decorator that is no dotted name with one call": (3, 9),
    "starred annotation of `*args`": (3, 11),
    "default of a type parameter": (3, 13),
    "exceptions without brackets (3.14)": (3, 14),
    "template string (3.14)": (3, 14),
    "several names in `except E, (a, b)` (2.7)": (2, 7),
    "string in an annotation that is no expression": (3, 0),
    "type comment behind a `def` that is no signature": (2, 7),
    "star in a signature comment": (2, 7),
    "round brackets inside of a signature comment": (2, 7),
    "type comment that is no expression": (2, 7),
}

#: A line that is analysed and reported: the statement holds a bare `...` where an expression is needed.
BARE_ELLIPSIS = re.compile(r"TypeError\('Expected CExpression, got CNode'\)\n  logical tokens: .*\.\.\.")

#: What Python refuses for more than the form of one statement: an encoding, the order or the names of
#: future imports, where a statement stands, what a name is bound to.
BEYOND_A_STATEMENT = re.compile(
    r"encoding|unicode error|codec|null bytes|future|not a chance|outside|indent|assign|delete|annotat"
    r"|'return'|'break'|'continue'|'await'|'yield'|nonlocal|global|duplicate|unpack|starred|import \*"
)


@cache
def found_libraries() -> dict[tuple[int, int], Library]:
    return libraries()


@cache
def findings_of(version: tuple[int, int]) -> Findings:
    library = found_libraries().get(version)
    if library is None:
        pytest.skip(f"no Python {version[0]}.{version[1]} on this machine")
    return survey(library, 1 if FULL or version == HERE else 10)


def name(version: tuple[int, int]) -> str:
    return f"{version[0]}.{version[1]}"


@pytest.mark.parametrize("version", VERSIONS, ids=name)
def test_nothing_is_rejected_but_on_purpose(version: tuple[int, int], capsys: pytest.CaptureFixture[str]) -> None:
    findings = findings_of(version)
    kinds = sorted({title for rejection in findings.rejections for title in rejection.kinds or ()})
    with capsys.disabled():
        counts = "".join(f"\n    {findings.count(title):4} {title}" for title in kinds)
        print(f"\n{findings.library.name}: {findings.statements:,} statements in {findings.files:,} files{counts}")
    assert [str(rejection) for rejection in findings.unexplained] == []
    assert [title for title in kinds if ALLOWED[title] > version] == []
    assert findings.unreadable == []
    assert findings.statements > 100 * findings.files > 0


@pytest.mark.parametrize("version", VERSIONS, ids=name)
def test_no_line_ends_in_an_internal_error(version: tuple[int, int]) -> None:
    reports = findings_of(version).internal_errors
    assert [report for report in reports if not BARE_ELLIPSIS.search(report)] == []


@pytest.mark.parametrize("version", [version for version in VERSIONS if version <= (3, 11)], ids=name)
def test_no_pattern_is_met_before_patterns_existed(version: tuple[int, int]) -> None:
    """Code of before 3.10 has names such as `match` and `case`; none of it is a pattern, and none is rejected."""
    findings = findings_of(version)
    if version < (3, 10):
        assert not any("pattern" in title for rejection in findings.rejections for title in rejection.kinds or ())


def test_what_python_refuses_carries_an_error() -> None:
    """The library's own bad files. What needs more than a look at a statement is not seen, and said to be so."""
    library = found_libraries()[HERE]
    if not library.has_tests:
        pytest.skip("this Python comes without the tests of its library, among which its files with errors are")
    bad = [path for path in library.root.rglob("*bad*.py") if not NOT_THE_LIBRARY & set(path.parts)]
    refusals = library.refusals(bad)
    assert refusals, "the library has files with errors, for its tests"
    overlooked = [f"{path}: {why}" for path, why in refusals.items() if not has_error(path)]
    assert [text for text in overlooked if not BEYOND_A_STATEMENT.search(text)] == []


def has_error(path: Path) -> bool:
    try:
        return bool(analyze(path.read_bytes(), exact=True).errors)
    except ValueError:
        return True


# ---- the kinds themselves ----

EXAMPLES = [
    ("sequence pattern without brackets", (3, 10), "case a, *rest: pass"),
    ("pattern in round brackets, or `()`", (3, 10), "case (1 as z) if z: pass"),
    ("pattern in round brackets, or `()`", (3, 10), "case (): pass"),
    ("strings side by side in a pattern", (3, 10), "case 'a' 'b' \"c\": pass"),
    ("`with` around what cannot stand without its brackets", (3, 8), "with (yield x) as y: pass"),
    ("`with` around what cannot stand without its brackets", (3, 8), "with (x := f()): pass"),
    ("`with` around what cannot stand without its brackets", (3, 8), "with (x for x in y): pass"),
    ("`async with` with its items in brackets", (3, 9), "async with (open(a) as f, g as h,): pass"),
    ("decorator that is no dotted name with one call", (3, 9), "@a[0].b"),
    ("decorator that is no dotted name with one call", (3, 9), "@a or b"),
    ("decorator that is no dotted name with one call", (3, 9), "@a.b(c)(d)"),
    ("starred annotation of `*args`", (3, 11), "def f(a, *args: *Ts, b=1): pass"),
    ("default of a type parameter", (3, 13), "class C[T: int = int, *Ts = *tuple[int], **P = [int]]: pass"),
    ("exceptions without brackets (3.14)", (3, 14), "except* A, B: pass"),
    ("template string (3.14)", (3, 14), "x = t'{a}' + Rt'b'"),
    ("several names in `except E, (a, b)` (2.7)", (2, 7), "except E, (a, b): pass"),
    ("string in an annotation that is no expression", (3, 8), "def f(a: 'any text', b: 'more of it'): pass"),
    ("type comment behind a `def` that is no signature", (3, 8), "def f(a):  # type: ignore[override]"),
    ("star in a signature comment", (3, 8), "def f(*a):  # type: (*int) -> int"),
    ("round brackets inside of a signature comment", (3, 8), "def f(a, b):  # type: ((A), B[(C)]) -> int"),
    ("round brackets inside of a signature comment", (3, 8), "def f(a):  # type: (int) -> (str)"),
    ("type comment that is no expression", (3, 8), "x = 1  # type: any text"),
]


@pytest.mark.parametrize(("title", "version", "source"), EXAMPLES, ids=[example[2] for example in EXAMPLES])
def test_each_kind_is_known(title: str, version: tuple[int, int], source: str) -> None:
    analysis = analyze(source, version=version, exact=True)
    assert [rejections.explain(analysis, line) for line in analysis.errors] == [[title]]


#: Near to a kind, or of a kind with a fault beside it.
FAULTS = [
    ((3, 13), "case a,, b:"),
    ((3, 13), "case (1 as z) 2:"),
    ((3, 13), "case (a, b c):"),
    ((3, 13), "with (a b): pass"),
    ((3, 13), "with (a as b c): pass"),
    ((3, 13), "@a[0] b"),
    ((3, 13), "@a b"),
    ((3, 13), "def f(a: *Ts): pass"),
    ((3, 13), "class C[T = int] = 1: pass"),
    ((3, 13), "except A, B: pass"),
    ((3, 13), "x = t'{a}'"),
    ((2, 7), "except E, (a, b: pass"),
    ((3, 8), "x y"),
    ((3, 8), "def f(a: 'any text') 1: pass"),
    ((3, 8), "x = = 1  # type: int"),
]


@pytest.mark.parametrize(("version", "source"), FAULTS, ids=[fault[1] for fault in FAULTS])
def test_no_kind_covers_a_fault(version: tuple[int, int], source: str) -> None:
    analysis = analyze(source, version=version, exact=True)
    assert analysis.errors
    assert None in [rejections.explain(analysis, line) for line in analysis.errors]


def test_every_kind_is_allowed_and_has_an_example() -> None:
    titles = [kind.title for kind in rejections.KINDS]
    assert titles == list(ALLOWED)
    assert set(titles) == {example[0] for example in EXAMPLES}


def test_every_kind_is_documented() -> None:
    text = DOCUMENT.read_text(encoding="utf-8")
    assert [kind.title for kind in rejections.KINDS if kind.title not in text] == []
