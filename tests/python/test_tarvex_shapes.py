"""Statements like earlier ones: a host gets the records of all of them as if each were analysed.

An analyzer tells what frequent statements say from earlier ones of their shape, until the host has looked into it.
One that was looked into at once is what the others are compared with.
"""

from __future__ import annotations

import sysconfig
from collections.abc import Callable
from pathlib import Path

import pytest

from lines import PY2_KEYWORDS
from quillet.logicalline import CLogicalLine, GetLogicalsFromText, kAssignment, kReturn
from quillet.tarvex import CNode, CPGenAnalyzerImpl, CPGenParserImpl, kPy2DefaultGrammar

Version = tuple[int, int, int]
VERSIONS: list[Version] = [(2, 7, 18), (3, 4, 0), (3, 8, 0), (3, 12, 0)]
#: More often than a shape is to be met.
OFTEN = 12

FAMILIES = [
    "x{0} = f{0}(y{0}, {0})",
    "return self.a{0}.b(c{0}, d='{0}')",
    "for i{0} in range(n{0}): pass",
    "def f{0}(a{0}, b{0}=None): pass",
    "from a{0} import b{0} as c{0}",
    "print(x{0})",
    "with open(p{0}) as f{0}: pass",
    "if x{0} is not None and y{0}[0]: pass",
    "x{0} = f'{{a{0}}} b'",
    "x{0} = []  # type: List[a{0}]",
    "def f{0}(a): pass  # type: (int) -> a{0}",
    "x{0}: 'A{0}' = b",
    "x{0} = = y",
    "assert isinstance(x{0}, T{0})",
    "raise E{0}(m % n{0})",
    "x{0} = a{0} + " + " + ".join(["b" * 20] * 8),
    "match x{0}:",
    "case A{0}(b=c): pass",
    "# type: ignore{0}",
]


def new_analyzer(version: Version) -> CPGenAnalyzerImpl:
    if version < (3, 0):
        return CPGenAnalyzerImpl(version, kPy2DefaultGrammar, PY2_KEYWORDS, False)
    return CPGenAnalyzerImpl(version)


def analyzers(version: Version) -> tuple[CPGenAnalyzerImpl, CPGenAnalyzerImpl]:
    """One that tells, and one that analyses."""
    telling, analysing = new_analyzer(version), new_analyzer(version)
    assert analysing._fNodeWalker is not None
    return telling, analysing


def said(analyzer: CPGenAnalyzerImpl, line: CLogicalLine, *where: bool) -> object:
    """What the analysis of a line says and leaves."""
    error = analyzer.AnalyzeSingleLogical(line, *(where or (False,)))
    shown = error and (type(error), error.args, getattr(error, "lineno", None), getattr(error, "offset", None))
    return shown, line.fParsed, line.fTypeEquivs, line.fArgTypeEquivs


def members(family: str) -> str:
    return "".join(family.format(number) + "\n" for number in range(OFTEN))


def lines_of(text: str, version: Version) -> tuple[CLogicalLine, ...]:
    return GetLogicalsFromText(text, version[:2])


def test_a_told_statement_says_what_an_analysed_one_does() -> None:
    for version in VERSIONS:
        telling, analysing = analyzers(version)
        for where in ((False, False), (True, False), (False, True)):
            text = "".join(map(members, FAMILIES))
            for told, analysed in zip(lines_of(text, version), lines_of(text, version), strict=True):
                assert said(telling, told, *where) == said(analysing, analysed, *where), told.fToks


def again(line: CLogicalLine) -> None:
    line.AppendTypeEquiv(b"old", b"info")
    line.fParsed = False


def with_a_list(line: CLogicalLine) -> None:
    line.fTypeEquivs = [(b"of the", b"host")]


def with_other_tokens(line: CLogicalLine) -> None:
    line.fToks = ("other", *line.fToks[1:])


def with_a_kind(line: CLogicalLine) -> None:
    line.fType = kReturn if line.fType == kAssignment else kAssignment


def with_positions(line: CLogicalLine) -> None:
    line.fPositions = tuple((number, 7) for number in range(len(line.fPositions)))


def with_a_count(line: CLogicalLine) -> None:
    line.fTokenCount = 0


def with_token_types(line: CLogicalLine) -> None:
    line.fTokTypes = list(line.fTokTypes)


def with_tokens_read(line: CLogicalLine) -> None:
    assert len(line.fToks) == len(line.fPositions) == len(line.fTokTypes)


@pytest.mark.parametrize(
    "change",
    [
        again,
        with_a_list,
        with_other_tokens,
        with_a_kind,
        with_positions,
        with_a_count,
        with_token_types,
        with_tokens_read,
    ],
)
def test_so_it_is_with_whatever_the_host_does_to_a_line(change: Callable[[CLogicalLine], None]) -> None:
    version = (3, 12, 0)
    telling, analysing = analyzers(version)
    text = "".join(map(members, FAMILIES))
    for told, analysed in zip(lines_of(text, version), lines_of(text, version), strict=True):
        change(told)
        change(analysed)
        assert said(telling, told) == said(analysing, analysed)
        # And once more, with what the first time left.
        for line in (told, analysed):
            line.fParsed = False
        assert said(telling, told) == said(analysing, analysed)


def test_lines_are_told_in_any_order() -> None:
    telling, analysing = analyzers((3, 12, 0))
    text = members(FAMILIES[0])
    told, analysed = lines_of(text, (3, 12, 0)), lines_of(text, (3, 12, 0))
    expected = [said(analysing, line) for line in analysed]
    for line in reversed(told):
        said(telling, line)
    assert [(None, line.fParsed, line.fTypeEquivs, line.fArgTypeEquivs) for line in told] == expected


def test_expressions_within_tokens_are_lines_like_any() -> None:
    version = (3, 12, 0)
    telling, analysing = analyzers(version)
    text = members("x = f'{{a{0}.b(c)}} and {{d[{0}]}}'")
    for told, analysed in zip(lines_of(text, version), lines_of(text, version), strict=True):
        for inner_told, inner_analysed in zip(told.GetExpLogicals(), analysed.GetExpLogicals(), strict=True):
            assert said(telling, inner_told) == said(analysing, inner_analysed)


def test_operations_of_a_subclass_are_called_for_each_line() -> None:
    class Noting(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            noted.append(name)
            super().AppendTypeEquiv(name, equiv)

    noted: list[bytes] = []
    analyzer = new_analyzer((3, 12, 0))
    for line in lines_of(members("x{0} = y{0}"), (3, 12, 0)):
        analyzer.AnalyzeSingleLogical(Noting(line.fType, line.fToks, line.fPositions), False)
        analyzer.AnalyzeSingleLogical(line, False)
    assert noted == [name for i in range(OFTEN) for name in (b"x%d" % i, b"x%d" % i, b"y%d" % i)]


@pytest.mark.parametrize(
    "look", [lambda analyzer, line: analyzer._fLogicalParser, lambda analyzer, line: analyzer.ParseToNode(line, False)]
)
def test_an_analyzer_may_be_looked_into_at_any_time(
    look: Callable[[CPGenAnalyzerImpl, CLogicalLine], object],
) -> None:
    telling, analysing = analyzers((3, 12, 0))
    text = members("x{0} = y{0}")
    for number, told in enumerate(lines_of(text, (3, 12, 0))):
        (analysed,) = lines_of(f"x{number} = y{number}", (3, 12, 0))
        assert said(telling, told) == said(analysing, analysed)
        if number == OFTEN - 3:
            assert look(telling, told) is not None


def test_classes_of_the_hosts_own_for_states_are_used(monkeypatch: pytest.MonkeyPatch) -> None:
    kinds = dict(CPGenParserImpl.kClsForState)
    monkeypatch.setattr(CPGenParserImpl, "kClsForState", {**kinds, "expr_stmt": CNode})
    telling, analysing = analyzers((3, 12, 0))
    text = members("x{0} = y{0}")
    for told, analysed in zip(lines_of(text, (3, 12, 0)), lines_of(text, (3, 12, 0)), strict=True):
        assert said(telling, told) == said(analysing, analysed)


def test_a_library_is_told_as_it_is_analysed() -> None:
    version = (3, 12, 0)
    telling, analysing = analyzers(version)
    folder = Path(sysconfig.get_path("stdlib"))
    paths = sorted(folder.glob("*.py"))
    assert paths
    for path in paths:
        text = path.read_bytes().decode("utf-8", "replace")
        for told, analysed in zip(lines_of(text, version), lines_of(text, version), strict=True):
            assert said(telling, told) == said(analysing, analysed), (path, told.fToks)
