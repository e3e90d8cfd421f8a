"""Hints in comments are those that the host's `ast` finds, over sources of every form.

Every form of statement that takes a type comment is put together with hints of every kind, with the spellings
of the comment, and with methods, loops and classes around it; names, hints and the names read in them are
compared with `ast.parse(..., type_comments=True)` and its mode "func_type". Where quillet means to differ, an
example says how. docs/agreement.md shows the counts over packages.
"""

from __future__ import annotations

import itertools
from pathlib import Path

import pytest

import hint_agreement
from hint_agreement import HintKind, HintReport, HintRule
from quillet import RecordKind, analyze

DOCUMENT = Path(__file__).resolve().parent.parent.parent / "docs" / "agreement.md"

CALL = "x.y[z.w](v)"
HINTS = [
    "int",
    "a.b.C",
    "List[int]",
    "Dict[str, List[Tuple[int, ...]]]",
    "Callable[[int, 'X'], None]",
    "Callable[..., T]",
    "Tuple[()]",
    "Optional['X']",
    "'X'",
    '"Dict[str, X]"',
    "Literal['a b', 1, -2, None, True]",
    "int | None",
    CALL,
    "None",
    "lambda a: b",
    "[int, str]",
    "ignored",
    "größe.Ω",
]

SPELLINGS = ["# type: {}", "#type:{}", "#  type:  {}  ", "# type: {}  # why", "# type: {} # x # y", "#\ttype:\t{}"]

#: A statement with a comment at its end; the first blank is the comment.
STATEMENTS = [
    "x = 1  {}",
    "x = {{1: 2}}  {}",
    "x.y.z = f(a)(b)  {}",
    "x = (\n    1,\n    2,\n)  {}",
    "x = '''\na # type: b\n'''  {}",
    "x = y + \\\n    1  {}",
    "a = 1; x = 2  {}",
    "x = '# type: str'  {}",
    "for x in y:  {}\n    pass",
    "for x.y in z[0]:  {}\n    pass\nelse:\n    pass",
    "with x as y:  {}\n    pass",
    "with x() as y.z, w:  {}\n    pass",
    "async def f():\n    async for x in y:  {}\n        pass",
    "async def f():\n    async with x as y:  {}\n        pass",
    "class C:\n    x = 1  {}\n    def f(self):\n        self.x = 2  {}",
    "def f(  # why\n    a,  {}\n    b=1  {}\n):\n    pass",
    "def f(a,  {}\n      *b,  {}\n      c=(1, [2]),  {}\n      **d  {}\n      ): pass",
    "def f(a=x[1:2], *, b={{1: 2}},  {}\n      c=lambda: 0): pass",
    "if x:\n    try:\n        y = 1  {}\n    finally:\n        pass",
]

SIGNATURES = [
    "() -> {0}",
    "({0}) -> None",
    "({0}, {0}) -> {0}",
    "(int, {0}, str) -> Dict[int, {0}]",
    "(...) -> {0}",
]

#: A function with the comment behind its head, or on a row of its own.
FUNCTIONS = [
    "def f():  {}\n    pass",
    "def f(a, b):  {}\n    return a",
    "def f(a, b=1, *c, d, e=2, **g):  {}\n    pass",
    "def f(a, b):\n    {}\n    pass",
    "def f():\n    {}\n    '''Text.'''",
    "def f(a,\n      b,  # type: X\n      c  # why\n      ):  {}\n    pass",
    "def f(\n    a  # type: X\n):\n    # why\n\n    {}\n    # more\n    pass",
    "async def f(a, b):  {}\n    pass",
    "def f(a, b):  # type: ignore\n    {}\n    pass",
    "@d\nclass C(D):\n    @staticmethod\n    def f(a, b):\n        {}\n        pass",
    "def f(a):\n    def g(b):\n        {}\n        pass\n    x = 1  # type: X",
]

#: Targets and hints of the same shape.
SHAPES = [
    ("a, b = 1", "int, str"),
    ("a, b = 1", "(int, str)"),
    ("(a, b) = 1", "int, str"),
    ("[a, b] = 1", "[int, str]"),
    ("a, (b, c.d) = 1", "int, (str, T)"),
    ("(a, b), [c, [d, e]] = 1", "(A, B), (C, (D, E))"),
    ("a, = 1", "int,"),
    ("x = 1", "int, str"),
    ("x, y.z, = 1", "int, str,"),
    ("for a, (b, c) in x:", "int, (str, T)"),
    ("with x as (a, b):", "int, str"),
]


def compared(source: str) -> HintReport:
    report = HintReport()
    report.compare("example", source.encode())
    assert report.unexplained + report.faults == []
    assert (report.files, report.not_python, report.misplaced) == (1, 0, 0)
    return report


def explained(report: HintReport) -> dict[HintKind, dict[HintRule, int]]:
    return {kind: dict(tally.explained) for kind, tally in report.tallies.items() if tally.explained}


def agreeing(report: HintReport) -> dict[HintKind, int]:
    return {kind: tally.agreeing for kind, tally in report.tallies.items() if tally.agreeing}


@pytest.mark.parametrize("statement", STATEMENTS)
def test_every_hint_of_a_statement_is_found(statement: str) -> None:
    for hint, spelling in itertools.product(HINTS, SPELLINGS):
        comment = spelling.format(hint)
        report = compared(statement.format(*[comment] * statement.count("{}")))
        assert explained(report) == {}
        found = agreeing(report)
        assert found.get(HintKind.VARIABLE, 0) + found.get(HintKind.PARAMETER, 0) == statement.count("{}")
    assert report.tallies[HintKind.READ].agreeing >= 2  # größe.Ω and its front


@pytest.mark.parametrize("function", FUNCTIONS)
def test_every_signature_is_found(function: str) -> None:
    for hint, signature, spelling in itertools.product(HINTS, SIGNATURES, SPELLINGS):
        has_types = signature[1] not in ")."
        if hint == CALL or (has_types and function.startswith("def f():  ")):
            continue  # rejected, and without records
        report = compared(function.format(spelling.format(signature.format(hint))))
        for rules in explained(report).values():
            assert set(rules) == {HintRule.SURPLUS}
        assert agreeing(report)[HintKind.RETURN] == 1


@pytest.mark.parametrize(("target", "hint"), SHAPES)
def test_targets_are_paired_with_hints(target: str, hint: str) -> None:
    for spelling in SPELLINGS:
        body = "\n    pass" if target.endswith(":") else ""
        report = compared(f"{target}  {spelling.format(hint)}{body}")
        assert explained(report) == {}
        assert agreeing(report)[HintKind.VARIABLE] >= 1


@pytest.mark.parametrize(
    "comment",
    [
        "# type: ignore",
        "#type:ignore",
        "# type: ignore # why",
        "# type:",
        "# Type: int",
        "# type : int",
        "# mytype: int",
        "# see type: int",
        "# type",
        "# type int",
        "## type:",
    ],
)
def test_what_is_no_hint_is_none_for_both(comment: str) -> None:
    for statement in [*STATEMENTS, *FUNCTIONS]:
        source = statement.replace("# type: X", "").format(*[comment] * statement.count("{}"))
        report = compared(source)
        assert explained(report) == {}
        assert agreeing(report) == {}


# ---- the rules, one by one ----

SELF = "class C:\n    def f(self, a, *b):  # type: (int, str) -> T\n        pass"

EXAMPLES = [
    (HintRule.IGNORE, "x = 1  # type: ignore[a]", {HintKind.VARIABLE: 1}),
    (HintRule.IGNORE, "def f(a,  # type: ignore[a-b]\n      ): pass", {HintKind.PARAMETER: 1}),
    (HintRule.BEHIND, "x = 1  # why # type: int", {HintKind.VARIABLE: 1}),
    (HintRule.BEHIND, "def f(a,  # why # type: int\n      ):  # why # type: (...) -> int\n    pass",
     {HintKind.PARAMETER: 1, HintKind.RETURN: 1}),
    (HintRule.CHAINED, "x = y = z = 1  # type: int", {HintKind.VARIABLE: 2}),
    (HintRule.SHAPE, "x, y = 1  # type: int", {HintKind.VARIABLE: 1}),
    (HintRule.SHAPE, "x, (y, z) = 1  # type: int, str", {HintKind.VARIABLE: 1}),
    (HintRule.NOT_DOTTED, "x[0] = 1  # type: int", {HintKind.VARIABLE: 1}),
    (HintRule.NOT_DOTTED, "x, *y = 1  # type: int, str", {HintKind.VARIABLE: 1}),
    (HintRule.ANNOTATED, "def f(a: int,  # type: str\n      ): pass", {HintKind.PARAMETER: 1}),
    (HintRule.FROM_THE_FIRST, SELF, {HintKind.SIGNATURE: 4}),
    (HintRule.CONTINUED, "x = 1 \\\n  # type: int", {HintKind.VARIABLE: 1}),
    (HintRule.SURPLUS, "def f(a):  # type: (int, str) -> T\n    pass", {HintKind.SIGNATURE: 1}),
    (HintRule.TRAILING_COMMA, "def f(a):  # type: (int,) -> T\n    pass", {HintKind.SIGNATURE: 1, HintKind.RETURN: 1}),
    (HintRule.BARE_ELLIPSIS, "x = 1  # type: ...", {HintKind.VARIABLE: 1}),
    (HintRule.NO_PARAMETERS, "def f():  # type: (int) -> T\n    pass", {HintKind.RETURN: 1}),
    (HintRule.REJECTED, "def f(*a):  # type: (*int) -> T\n    pass", {HintKind.SIGNATURE: 1, HintKind.RETURN: 1}),
]  # fmt: skip


@pytest.mark.parametrize(("rule", "source", "counts"), EXAMPLES, ids=[f"{e[0].name}-{e[1]}"[:40] for e in EXAMPLES])
def test_each_rule_explains_its_differences(rule: HintRule, source: str, counts: dict[HintKind, int]) -> None:
    assert explained(compared(source)) == {kind: {rule: count} for kind, count in counts.items()}


def test_each_rule_has_an_example_and_is_documented() -> None:
    assert {example[0] for example in EXAMPLES} == set(HintRule)
    text = DOCUMENT.read_text(encoding="utf-8")
    assert [rule.value for rule in HintRule if rule.value not in text] == []


# ---- comments in places where the host takes none ----


def hints(source: str) -> list[tuple[str, str]]:
    lines = analyze(source).lines
    return [(record.name, record.detail) for line in lines for record in line.records if record.kind is RecordKind.HINT]


@pytest.mark.parametrize(
    ("source", "found"),
    [
        ("for x in y: pass  # type: int", [("x", "int")]),
        ("with x as y: pass  # type: int", [("y", "int")]),
        ("def f(a): pass  # type: (int) -> str", []),
        ("x: int = 1  # type: str", [("x", "int")]),
        ("x += 1  # type: int", []),
        ("f(x)  # type: int", []),
        ("x = [  # type: int\n    1]", []),
        ("x = [\n    1,  # type: int\n]", []),
        ("# type: int\nx = 1", []),
        ("def f(a):\n    pass\n    # type: (int) -> str", []),
        ("def f(a,  # type: int\n      b): return a  # type: str", [("a", "int")]),
    ],
)
def test_comments_that_the_host_refuses(source: str, found: list[tuple[str, str]]) -> None:
    assert hints(source) == found
    report = HintReport()
    report.compare("example", source.encode())
    assert report.misplaced == 1
    assert report.unexplained + report.faults == []


# ---- that a difference is seen ----


@pytest.mark.parametrize(
    ("source", "other"),
    [
        ("x = 1  # type: int", "x = 1"),
        ("x = 1", "x = 1  # type: int"),
        ("x = 1  # type: int", "x = 1  # type: str"),
        ("x = 1  # type: int", "y = 1  # type: int"),
        ("x, y = 1  # type: int, str", "x, y = 1  # type: str, int"),
        ("def f(a,  # type: int\n  b): pass", "def f(a,\n  b  # type: int\n): pass"),
        ("def f(a):  # type: (int) -> str\n  pass", "def f(a):\n  # type: (int) -> str\n  pass"),
        ("def f(a, b):\n  # type: (int, X) -> str\n  pass", "def f(a, b):\n  # type: (X, int) -> str\n  pass"),
        ("def f(a) -> int: pass", "def f(a: int): pass"),
        ("x = 1  # type: 'int'", "x = 1  # type: int"),
    ],
)
def test_what_is_said_of_another_source_is_a_difference(
    monkeypatch: pytest.MonkeyPatch, source: str, other: str
) -> None:
    monkeypatch.setattr(
        hint_agreement, "analyze", lambda text, version, exact: analyze(other, version=version, exact=exact)
    )
    report = HintReport()
    report.compare("example", source.encode())
    assert report.unexplained != []
