"""What quillet says of names is what the host's own `ast` says, over its own standard library.

Every fact of the syntax trees is compared, and every difference has to follow from a rule. The default is a
sample of the library; QUILLET_FULL=1 takes all of it. docs/agreement.md shows the counts.
"""

from __future__ import annotations

import os
import sys
from pathlib import Path

import pytest

import agreement
from agreement import Report
from expected_names import Kind, Rule

DOCUMENT = Path(__file__).resolve().parent.parent.parent / "docs" / "agreement.md"
FULL = os.environ.get("QUILLET_FULL") == "1"
EACH_NTH_FILE = 1 if FULL else 6


@pytest.fixture(scope="module")
def library() -> Report:
    report = Report()
    for path in agreement.own_library(EACH_NTH_FILE):
        report.compare(str(path), path.read_bytes())
    return report


@pytest.mark.parametrize("kind", Kind, ids=lambda kind: kind.value)
def test_the_library_is_told_of_alike(library: Report, kind: Kind) -> None:
    tally = library.tallies[kind]
    assert tally.unexplained == []
    if kind is not Kind.TYPE_PARAMETER or (FULL and sys.version_info >= (3, 12)):
        assert tally.agreeing > 10
    if tally.facts > 10_000:
        # The rules are about rare forms. The most frequent difference is `x.y += 1`, which does not bind x.y.
        assert tally.agreeing / tally.facts > 0.95


#: What a complete reading says otherwise on purpose.
OF_ALL_READINGS = {
    Rule.AUGMENTED,
    Rule.DELETED,
    Rule.ANNOTATION_ONLY,
    Rule.IN_TARGET,
    Rule.BRACKETED_CHAIN,
    Rule.STRING_HINT,
    Rule.COMMENT_HINT,
    Rule.CONSTANT_CHAIN,
    Rule.LONE_STAR,
    Rule.DECORATOR,
}


def test_a_complete_reading_loses_nothing() -> None:
    report = Report(exact=False)
    for path in agreement.own_library(2 * EACH_NTH_FILE):
        report.compare(str(path), path.read_bytes())
    assert (report.unexplained, report.faults) == ([], [])
    assert report.events.internal_errors == report.events.limits == 0
    assert {rule for tally in report.tallies.values() for rule in tally.explained} <= OF_ALL_READINGS
    assert report.tallies[Kind.READ].agreeing > 10_000


def test_every_statement_of_the_library_is_served(library: Report) -> None:
    assert library.faults == []
    assert library.events.internal_errors == library.bare_ellipses
    assert library.files > 100
    assert library.not_python < library.files / 20


# ---- the rules, one by one ----

EXAMPLES = [
    (Rule.AUGMENTED, "x += 1", {Kind.READ: 1, Kind.BOUND: 1}),
    (Rule.AUGMENTED, "x.y += 1", {Kind.CHAIN: 1, Kind.ATTRIBUTE: 1}),
    (Rule.DELETED, "del x, y.z, w[i]", {Kind.READ: 1, Kind.CHAIN: 1}),
    (Rule.ANNOTATION_ONLY, "x: int", {Kind.BOUND: 1}),
    (Rule.ANNOTATION_ONLY, "x.y: int", {Kind.ATTRIBUTE: 1}),
    (Rule.BRACKETED_TARGET, "(x) = 1", {Kind.BOUND: 1}),
    (Rule.BRACKETED_TARGET, "for [(x), y] in z: pass", {Kind.BOUND: 1}),
    (Rule.STARRED_GROUP, "a, *[b, c] = d", {Kind.BOUND: 2}),
    (Rule.IN_TARGET, "f(x, y[i]).z = 1", {Kind.READ: 1}),
    (Rule.IN_TARGET, "f(x.y.z).w, (a)[0] = 1, 2", {Kind.CHAIN: 1, Kind.READ: 1}),
    (Rule.IN_TARGET, "[0 for f(x).y in z]", {Kind.READ: 1, Kind.WITHIN: 1}),
    (Rule.WITH_TARGET, "with x as y.z, a as b[i]: pass", {Kind.READ: 3}),
    (Rule.BRACKETED_CHAIN, "(x).y.z", {Kind.CHAIN: 2}),
    (Rule.BRACKETED_CHAIN, "(x).y(1)", {Kind.CHAIN: 1, Kind.CALLED: 1}),
    (Rule.STRING_HINT, "def f(a: 'A', b: List['B']) -> 'C | d.D': pass", {Kind.READ: 4, Kind.CHAIN: 1}),
    (Rule.STRING_HINT, "cast('T', typing.cast('S | None', x))", {Kind.READ: 2}),
    (Rule.COMMENT_HINT, "x = []  # type: List[a.B]", {Kind.READ: 2, Kind.CHAIN: 1}),
    (Rule.LONE_CASE, "match x:\n  case y: pass", {Kind.BOUND: 1}),
    (Rule.LONE_CASE, "match x:\n  case y.z: pass", {Kind.READ: 1, Kind.CHAIN: 1}),
    (Rule.DOTTED_PATTERN, "match x:\n  case [y.z, a.B(c=d)]: pass", {Kind.READ: 2, Kind.CHAIN: 2}),
    (Rule.CONSTANT_CHAIN, "None.x", {Kind.CHAIN: 1}),
    (Rule.LONE_STAR, "f(*x), f(**x), f(*x,), f(*x, y)", {Kind.CALLED: 1}),
    (Rule.DECORATOR, "@x\n@y.z()\n@w(1)\ndef f(): pass", {Kind.CALLED: 2}),
    (Rule.WALK_LIMIT, "x = " + "(" * 60 + "y" + ")" * 60, {Kind.READ: 1}),
    (Rule.REJECTED, "@x[0]\ndef f(): pass", {Kind.READ: 1}),
    (Rule.BARE_ELLIPSIS, "def f(x=y) -> ...: pass", {Kind.READ: 1, Kind.BOUND: 1, Kind.PARAMETER: 1}),
]
if sys.version_info >= (3, 12):
    EXAMPLES.append((Rule.ALIAS_PARAMETER, "type X[T] = T", {Kind.TYPE_PARAMETER: 1}))


@pytest.mark.parametrize(("rule", "source", "counts"), EXAMPLES, ids=[f"{e[0].name}-{e[1]}"[:40] for e in EXAMPLES])
def test_each_rule_explains_its_differences(rule: Rule, source: str, counts: dict[Kind, int]) -> None:
    report = Report()
    report.compare("example", source.encode())
    assert report.unexplained + report.faults == []
    found = {kind: dict(tally.explained) for kind, tally in report.tallies.items() if tally.explained}
    assert found == {kind: {rule: count} for kind, count in counts.items()}


def test_each_rule_has_an_example_and_is_documented() -> None:
    assert {example[0] for example in EXAMPLES} >= set(Rule) - {Rule.ALIAS_PARAMETER}
    text = DOCUMENT.read_text(encoding="utf-8")
    assert [rule.value for rule in Rule if rule.value not in text] == []


# ---- that a difference is seen ----


@pytest.mark.parametrize(
    ("source", "other", "problems"),
    [
        ("x = y", "x = 1", ["names read: 'y' is not recorded"]),
        ("x = 1", "x = y", ["names read: 'y' is recorded"]),
        ("x = y", "z = y", ["names bound: 'x' is not recorded", "names bound: 'z' is recorded"]),
        ("x.y = 1", "x", ["attributes bound: 'x.y' is not recorded"]),
        ("x.y", "x", ["dotted names read: 'x.y' is not recorded"]),
        ("f'{x}'", "x", ["names read in f-strings: 'x' is not recorded"]),
        ("import a.b", "import a.b as a", ["imports: 'a: as a' is", "'a: import a' is not", "a.b' is recorded"]),
        ("from . import a", "from .. import a", ["imports: 'a: from . a' is not", "'a: from .. a' is recorded"]),
        ("f(1, x)", "f(x)", ["calls: 'f' is not recorded", "calls: 'f' is recorded"]),
        ("def f(a): pass", "def f(b): pass", ["parameters: 'a' is not recorded", "parameters: 'b' is recorded"]),
        ("global a", "nonlocal a", ["declared global: 'a' is not", "declared nonlocal: 'a' is recorded"]),
        ("lambda a: 0", "lambda: 0", ["names bound inside of expressions: 'a' is not recorded"]),
        ("x += 1", "x = 1", ["names bound: 'x' is recorded", "names read: 'x' is not recorded"]),
        ("x = y\nz = w", "x = w\nz = y", ["example:1: ", "example:2: ", "'w' is recorded", "'y' is recorded"]),
    ],
    ids=lambda value: value if isinstance(value, str) else "",
)
def test_what_is_said_of_another_source_is_a_difference(
    monkeypatch: pytest.MonkeyPatch, source: str, other: str, problems: list[str]
) -> None:
    analyze = agreement.analyze
    monkeypatch.setattr(agreement, "analyze", lambda _, exact: analyze(other, exact=exact))
    report = Report()
    report.compare("example", source.encode())
    assert len(report.unexplained) == len(problems), report.unexplained
    for problem in problems:
        assert any(problem in text for text in report.unexplained), report.unexplained


def test_a_rejection_without_a_reason_is_a_fault(monkeypatch: pytest.MonkeyPatch) -> None:
    analyze = agreement.analyze
    monkeypatch.setattr(agreement, "analyze", lambda _, exact: analyze("x y", exact=exact))
    report = Report()
    report.compare("example", b"x")
    assert len(report.faults) == 1


@pytest.mark.parametrize(
    "source",
    [
        "x = (\n  y  # ) comment\n).z",
        "(\n  # comment\n  x\n) = y",
        "ª = ﬁ = 1",
        "a = 1; b = a; del b",
        "if x: y = z",
        "def f(a, /, b, *c, d=e, **g): return h",
        "@a\n\n@b\nclass C(D, e=F): g = h",
        "f'{a!r:{b}} {c:>{d}} {f\"{g}\"}'; i",
        "x = f'''{\na}''' f'{b}'\ny",
        "async def f():\n  async with a as b, c as d: await e(f, *g)\n  return [h async for i in j if k]",
        "try: a\nexcept (B, c.D) as e: f\nfinally: g",
        "lambda a, *b, c=d, **e: f(lambda g: h)",
        "match a, b:\n  case {'k': c, d.e: f, **g} if h: i\n  case C(x=[j, *k]) | l.M() as n: pass",
        "x[a:b, c].d, *e = f = g[(h := i)]",
        "global a, b",
    ],
)
def test_forms_that_are_easily_mistaken_are_compared_well(source: str) -> None:
    report = Report()
    report.compare("example", source.encode())
    assert report.unexplained + report.faults == []
    assert sum(tally.agreeing for tally in report.tallies.values()) > 0
