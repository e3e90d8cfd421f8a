"""One call a logical line: its flow, what it returns for a failure, what it leaves on the line."""

from __future__ import annotations

import logging
from collections.abc import Callable
from types import TracebackType

import pytest

from lines import analyzer, line_of
from quillet import reflect
from quillet.logicalline import (
    CLogicalLine,
    GetLogicalsFromText,
    kAssignment,
    kComment,
    kCommentedTypeHint,
    kFstringFieldExp,
    kStringifiedTypeHint,
)
from quillet.optpgen import ParseError
from quillet.symbolinfo import kGetPrefix, kSetPrefix
from quillet.tarvex import CPGenAnalyzer, CPGenAnalyzerImpl, CPGenParserImpl, CTypeHintWalker, kPy2DefaultGrammar


class WithEmbedded(CLogicalLine):
    """A line whose embedded expressions are handed in."""

    def __init__(self, text: str, embedded: object, **fields: object) -> None:
        line = line_of(text)
        super().__init__(line.fType, line.fToks, line.fPositions, **fields)
        self.embedded = embedded

    def GetExpLogicals(self) -> object:
        return self.embedded


def hint_line(text: str, kind: str, first_line: int = 0) -> CLogicalLine:
    line = line_of(text)
    return CLogicalLine(kind, line.fToks, line.fPositions, first_line=first_line)


def test_a_plain_statement_gives_none_and_records() -> None:
    line = line_of("x = y")
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fParsed
    assert line.fTypeEquivs == [(b"x", kSetPrefix), (b"x", b"y"), (b"y", kGetPrefix)]


def test_a_second_call_returns_none_even_after_an_error() -> None:
    line = line_of("x = = y")
    error = analyzer().AnalyzeSingleLogical(line, False)
    assert isinstance(error, SyntaxError)
    assert error.msg == "invalid syntax"
    assert (error.lineno, error.offset) == (1, 5)
    assert (error.filename, error.text) == ("<string>", "x = = y")
    assert analyzer().AnalyzeSingleLogical(line, False) is None


@pytest.mark.parametrize(
    "analyze",
    [
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line, True),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line, True, False),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line, 1, []),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line, in_async_def=True),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(first_in_def=0, in_async_def="yes", logical=line),
        lambda analyzer, line: CPGenAnalyzerImpl.AnalyzeSingleLogical(analyzer, line, True),
    ],
)
def test_a_call_may_name_its_arguments_and_give_any_truth(analyze: Callable[..., SyntaxError | None]) -> None:
    line = line_of("await x")
    assert analyze(analyzer((3, 6)), line) is None
    assert line.fTypeEquivs == [(b"x", kGetPrefix)]


@pytest.mark.parametrize(
    "analyze",
    [
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line, True, False, False),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical(line, True, logical=line),
        lambda analyzer, line: analyzer.AnalyzeSingleLogical("await x", True),
        lambda analyzer, line: CPGenAnalyzerImpl.AnalyzeSingleLogical(line, line, True),
    ],
)
def test_a_call_with_other_arguments_is_a_type_error(analyze: Callable[..., object]) -> None:
    line = line_of("await x")
    with pytest.raises(TypeError):
        analyze(analyzer((3, 6)), line)
    assert not line.fParsed


def test_a_truth_that_cannot_be_told_is_raised() -> None:
    class Neither:
        def __bool__(self) -> bool:
            raise LookupError("neither")

    line = line_of("x")
    with pytest.raises(LookupError, match="neither"):
        analyzer().AnalyzeSingleLogical(line, Neither())  # type: ignore[arg-type]
    with pytest.raises(LookupError, match="neither"):
        analyzer().AnalyzeSingleLogical(line, False, Neither())  # type: ignore[arg-type]
    assert not line.fParsed


def test_a_parsed_line_is_left_alone() -> None:
    line = line_of("x = 1")
    line.fParsed = True
    line.AppendTypeEquiv(b"kept", b"info")
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"kept", b"info")]


def test_analysis_clears_what_the_line_held_before() -> None:
    line = line_of("x")
    line.AppendTypeEquiv(b"old", b"info")
    line.AppendArgTypeEquiv(b"old", b"info")
    before = line.fTypeEquivs
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"x", kGetPrefix)]
    assert line.fArgTypeEquivs is None
    assert before == [(b"old", b"info")]


def test_a_failed_line_has_no_derived_information() -> None:
    line = line_of("try: pass\nexcept (a, b) as (c, d): pass".splitlines()[1])
    assert analyzer((2, 7)).AnalyzeSingleLogical(line_of("x = 1", (2, 7)), False) is None
    error = analyzer().AnalyzeSingleLogical(line, False)
    assert isinstance(error, SyntaxError)
    assert line.fTypeEquivs is None
    assert line.fArgTypeEquivs is None


def test_a_comment_is_not_parsed_but_its_embedded_lines_are_inspected() -> None:
    embedded = hint_line("List", kStringifiedTypeHint)
    line = WithEmbedded("# no = = statement", (embedded,))
    assert line.fType == kComment
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"List", kGetPrefix)]


@pytest.mark.parametrize("toks", [(), (None,), (None, None, None), ("# only a comment",)])
def test_a_line_without_tokens_to_feed_is_not_walked(toks: tuple[str | None, ...]) -> None:
    embedded = hint_line("List", kStringifiedTypeHint)
    line = WithEmbedded("x", (embedded,))
    line.fToks = toks
    line.fPositions = tuple((0, i) for i in range(len(toks)))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs is None


def test_an_error_in_a_stringified_hint_is_placed_in_the_outer_line() -> None:
    # The statement begins on line 10 and the hint stands on its third physical line.
    embedded = hint_line("List[", kStringifiedTypeHint, first_line=12)
    embedded.fPositions = tuple((line, column + 4) for line, column in embedded.fPositions)
    outer = WithEmbedded("f(a)", (embedded,), first_line=10)
    error = analyzer().AnalyzeSingleLogical(outer, False)
    assert isinstance(error, SyntaxError)
    message = "invalid syntax in stringified type hint"
    assert error.args[0] == message
    assert error.filename == message
    assert error.lineno == 3
    assert error.offset == 4 + len("List[") + 1
    assert error.text is not None
    assert error.text.strip() == "List["
    assert outer.fTypeEquivs is None


def test_an_error_in_an_fstring_field_is_plain_invalid_syntax() -> None:
    embedded = hint_line("a +", kFstringFieldExp)
    error = analyzer().AnalyzeSingleLogical(WithEmbedded("f(a)", (embedded,)), False)
    assert isinstance(error, SyntaxError)
    assert error.args[0] == "invalid syntax"
    assert (error.lineno, error.offset) == (1, 4)


def test_a_commented_hint_contributes_nothing() -> None:
    embedded = hint_line("not = = parsed", kCommentedTypeHint)
    embedded.AppendTypeEquiv(b"from the comment", b"info")
    line = WithEmbedded("x", (embedded,))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"x", kGetPrefix)]


def test_embedded_records_are_copied_up_in_order() -> None:
    line = WithEmbedded("x", (hint_line("b", kFstringFieldExp), hint_line("a", kStringifiedTypeHint)))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"x", kGetPrefix), (b"b", kGetPrefix), (b"a", kGetPrefix)]


def test_embedded_lines_are_not_looked_into_for_more() -> None:
    class Inner(CLogicalLine):
        asked = 0

        def GetExpLogicals(self) -> tuple[CLogicalLine, ...]:
            Inner.asked += 1
            return ()

    inner = Inner(kFstringFieldExp, ("a",), ((0, 0),))
    line = WithEmbedded("x", (inner,))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert Inner.asked == 0
    assert inner.fTypeEquivs == [(b"a", kGetPrefix)]


@pytest.mark.parametrize(
    ("embedded", "text"),
    [
        (None, "Expected tuple, got NoneType"),
        ([], "Expected tuple, got list"),
        ((1,), "Expected CLogicalLine, got int"),
        ((None,), "Expected CLogicalLine, got NoneType"),
    ],
)
def test_embedded_lines_are_a_tuple_of_lines(embedded: object, text: str) -> None:
    line = WithEmbedded("x", embedded)
    with pytest.raises(TypeError, match=text):
        analyzer()._InspectEmbeddedExpressions(line, None, False, False)


@pytest.mark.parametrize(
    ("pair", "text"),
    [
        ((b"a", b"b", b"c"), r"too many values to unpack \(expected 2\)"),
        ((b"a",), "need more than 1 value to unpack"),
        ((), "need more than 0 values to unpack"),
    ],
)
def test_records_of_embedded_lines_are_unpacked_strictly(pair: tuple[bytes, ...], text: str) -> None:
    class Embedded(CLogicalLine):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            pass

    embedded = Embedded(kFstringFieldExp, ("a",), ((0, 0),))
    embedded.fTypeEquivs = [pair]
    with pytest.raises(ValueError, match=text):
        analyzer()._InspectEmbeddedExpressions(WithEmbedded("x", (embedded,)), None, False, False)


class Raising(CLogicalLine):
    """A line that cannot be written to."""

    error: BaseException = KeyError("no such name")

    def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
        raise self.error


def raising(error: BaseException) -> Raising:
    line = Raising(kAssignment, ("x", "=", "1"), ((0, 0), (0, 2), (0, 4)))
    line.error = error
    return line


@pytest.mark.parametrize("error", [KeyError("no such name"), ZeroDivisionError("by zero"), MemoryError()])
def test_any_other_failure_is_reported_and_gives_none(error: BaseException, monkeypatch: pytest.MonkeyPatch) -> None:
    import sys

    reported = []

    def report(suppress_gui: bool = False) -> None:
        reported.append((sys.exc_info()[1], suppress_gui))

    monkeypatch.setattr(reflect, "ReportCurrentException", report)
    line = raising(error)
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    ((value, suppress_gui),) = reported
    assert isinstance(value, ValueError)
    assert str(value) == (f"Could not analyze logical -- inner exception is {error!r}\n  logical tokens: x = 1")
    assert suppress_gui is True
    assert line.fParsed
    assert line.fTypeEquivs is None
    assert sys.exc_info() == (None, None, None)


def test_a_failure_is_raised_again_from_where_it_came(monkeypatch: pytest.MonkeyPatch) -> None:
    raised = []

    def raise_with(exc: BaseException, tb: TracebackType | None) -> None:
        raised.append((exc, tb))

    monkeypatch.setattr(reflect, "RaiseWithTraceback", raise_with)
    # The call returns, and so the analysis goes on.
    assert analyzer()._InspectSingleLogical(raising(KeyError("k")), False) is True
    ((error, trace),) = raised
    assert isinstance(error, ValueError)
    assert "inner exception is KeyError('k')" in str(error)
    assert trace is not None
    assert trace.tb_frame.f_code.co_name == "AppendTypeEquiv"


def test_what_is_raised_in_the_place_of_a_failure_is_what_leaves(monkeypatch: pytest.MonkeyPatch) -> None:
    mine = LookupError("mine")

    def raise_with(exc: BaseException, tb: TracebackType | None) -> None:
        raise mine

    monkeypatch.setattr(reflect, "RaiseWithTraceback", raise_with)
    with pytest.raises(LookupError) as caught:
        analyzer()._InspectSingleLogical(raising(KeyError("k")), False)
    assert caught.value is mine


def test_a_report_goes_to_the_logger(caplog: pytest.LogCaptureFixture) -> None:
    with caplog.at_level(logging.WARNING, "quillet"):
        assert analyzer().AnalyzeSingleLogical(raising(KeyError("k")), False) is None
    (record,) = caplog.records
    assert record.exc_info is not None
    assert "inner exception is KeyError('k')" in str(record.exc_info[1])


def test_an_interrupt_is_caught_and_reported_as_it_is(monkeypatch: pytest.MonkeyPatch) -> None:
    import sys

    reported = []
    monkeypatch.setattr(reflect, "ReportCurrentException", lambda suppress_gui: reported.append(sys.exc_info()[1]))
    interrupt = KeyboardInterrupt()
    assert analyzer().AnalyzeSingleLogical(raising(interrupt), False) is None
    assert reported == [interrupt]


def test_a_syntax_error_of_the_host_is_returned_itself() -> None:
    error = SyntaxError("not here", ("file", 3, 4, "text"))
    assert analyzer().AnalyzeSingleLogical(raising(error), False) is error


def test_a_runtime_error_of_the_host_ends_the_walk_with_a_printed_line(capsys: pytest.CaptureFixture[str]) -> None:
    assert analyzer().AnalyzeSingleLogical(raising(RuntimeError("enough")), False) is None
    assert capsys.readouterr().out == "RuntimeError raised in CNodeWalker.Walk: RuntimeError('enough')\n"


class Enough(RuntimeError):
    """A limit of the host's own."""


@pytest.mark.parametrize("error", [Enough("q", 1), RecursionError("deep"), NotImplementedError("not yet")])
def test_a_printed_line_shows_the_exception_that_was_raised(
    error: RuntimeError, capsys: pytest.CaptureFixture[str]
) -> None:
    assert analyzer().AnalyzeSingleLogical(raising(error), False) is None
    assert capsys.readouterr().out == f"RuntimeError raised in CNodeWalker.Walk: {error!r}\n"


class Moody(ParseError):
    """A parse error of the host's own."""


@pytest.mark.parametrize(
    ("context", "place"),
    [(1, (1, 3)), (True, (1, 3)), (2**40, (1, 6)), ((0, 4), (1, 5)), ((2, 0), (3, 1)), ((1, -2), (2, 1))],
)
def test_a_parse_error_of_the_host_is_placed_by_its_context(context: object, place: tuple[int, int]) -> None:
    class Line(CLogicalLine):
        cleared = False

        def ClearDerivedInfo(self) -> None:
            if not self.cleared:
                self.cleared = True
                raise Moody("mine", None, None, context)

    line = Line(kAssignment, ("x", "=", "1"), ((0, 0), (0, 2), (0, 4)))
    error = analyzer().AnalyzeSingleLogical(line, False)
    assert isinstance(error, SyntaxError)
    assert (error.lineno, error.offset) == place


def test_an_argument_without_a_truth_value_fails_as_it_says() -> None:
    class Undecided:
        def __bool__(self) -> bool:
            raise LookupError("neither")

    line = line_of("x")
    with pytest.raises(LookupError, match="neither"):
        analyzer().AnalyzeSingleLogical(line, Undecided())


def test_a_failing_report_leaves_as_an_exception(monkeypatch: pytest.MonkeyPatch) -> None:
    def report(suppress_gui: bool) -> None:
        raise LookupError("no reporter")

    monkeypatch.setattr(reflect, "ReportCurrentException", report)
    with pytest.raises(LookupError, match="no reporter"):
        analyzer().AnalyzeSingleLogical(raising(KeyError("k")), False)


def test_a_clear_that_fails_in_a_handler_leaves_as_an_exception() -> None:
    class Line(CLogicalLine):
        cleared = 0

        def ClearDerivedInfo(self) -> None:
            self.cleared += 1
            if self.cleared == 2:
                raise LookupError("cannot clear")

    line = Line(kAssignment, ("x", "="), ((0, 0), (0, 2)))
    with pytest.raises(LookupError, match="cannot clear"):
        analyzer().AnalyzeSingleLogical(line, False)


def test_the_exception_being_handled_stays_current() -> None:
    import sys

    try:
        raise LookupError("outer")
    except LookupError as outer:
        error = analyzer().AnalyzeSingleLogical(line_of("x ="), False)
        handled = sys.exc_info()[1] is outer
    assert isinstance(error, SyntaxError)
    assert handled


def test_a_parse_error_that_a_handler_raises_leaves_as_it_is() -> None:
    class Line(CLogicalLine):
        cleared = 0

        def ClearDerivedInfo(self) -> None:
            self.cleared += 1
            if self.cleared == 2:
                raise mine

    mine = Moody("mine", None, None, 0)
    with pytest.raises(Moody) as caught:
        analyzer().AnalyzeSingleLogical(Line(kAssignment, ("x", "="), ((0, 0), (0, 2))), False)
    assert caught.value is mine


# ---- a host that changes a line under the analysis ----

LONG = "#" + "x" * 200_000


class Fickle(CLogicalLine):
    """A line that loses its tokens, its positions and its records at every record."""

    def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
        super().AppendTypeEquiv(name, equiv)
        self.fToks = ("q",)
        self.fPositions = ()

    AppendArgTypeEquiv = AppendTypeEquiv


@pytest.mark.parametrize(
    "toks",
    [
        ("del", "alpha", ",", "beta", ",", "gamma"),
        ("from", "alpha", "import", "beta", ",", "gamma"),
        ("def", "alpha", "(", "beta", ",", "# type: int", "gamma", ")", ":", "# type: (...) -> int"),
        ("for", "alpha", "in", "beta", ":", "# type: int"),
    ],
)
def test_tokens_that_a_host_replaces_meanwhile_are_read_to_the_end(toks: tuple[str, ...]) -> None:
    line = Fickle(toks=(*toks, LONG), positions=tuple((0, i) for i in range(len(toks) + 1)))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fToks == ("q",)
    names = {name.decode() for name, _ in line.fTypeEquivs or []}
    assert names
    assert names <= {"alpha", "beta", "gamma", "int", "return"}


def test_an_embedded_line_may_lose_its_tokens_too() -> None:
    toks = ("del", "alpha", ",", "beta", LONG)
    embedded = Fickle(toks=toks, positions=tuple((0, i) for i in range(5)))
    line = WithEmbedded("x = 1", (embedded,))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert {name for name, _ in line.fTypeEquivs} == {b"x", b"alpha", b"beta"}


def test_records_that_are_cleared_while_they_are_copied_are_copied_as_they_were() -> None:
    class Outer(WithEmbedded):
        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            super().AppendTypeEquiv(name, equiv)
            if name == b"aaaaa":
                embedded.ClearDerivedInfo()
                embedded.AppendTypeEquiv(b"Z" * 100, b"W" * 100)

    embedded = CLogicalLine(toks=("aaaaa", ",", "bbbbb"), positions=((0, 0), (0, 5), (0, 7)))
    line = Outer("x = 1", (embedded,))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs[-2:] == [(b"aaaaa", kGetPrefix), (b"bbbbb", kGetPrefix)]


def test_a_line_that_is_its_own_embedded_line_is_copied_once() -> None:
    class Line(CLogicalLine):
        def GetExpLogicals(self) -> tuple[CLogicalLine, ...]:
            assert self.fTypeEquivs
            return (self,)

    line = Line(kAssignment, ("x", "=", "y"), ((0, 0), (0, 2), (0, 4)))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    once = [(b"x", kSetPrefix), (b"x", b"y"), (b"y", kGetPrefix)]
    assert line.fTypeEquivs == once * 4


def test_inspecting_raises_what_analysing_returns() -> None:
    with pytest.raises(ParseError) as caught:
        analyzer()._InspectSingleLogical(line_of("x = = y"), False)
    assert caught.value.context == 2
    assert analyzer()._InspectSingleLogical(line_of("x"), False) is True


def test_the_interface_is_abstract_and_dispatches_to_an_override() -> None:
    for logical in (line_of("x"), None):
        with pytest.raises(NotImplementedError) as caught:
            CPGenAnalyzer().AnalyzeSingleLogical(logical, False)
        assert caught.value.args == ()

    class Mine(CPGenAnalyzer):
        def AnalyzeSingleLogical(self, logical: CLogicalLine, in_async_def: bool, first_in_def: bool = False) -> None:
            logical.SetParsed(True)

    line = line_of("x")
    Mine().AnalyzeSingleLogical(line, False)
    assert line.fParsed


def test_what_an_analyzer_shows() -> None:
    one = analyzer()
    assert one._fNodeWalker is one._fNodeWalker
    assert isinstance(one._fTypeHintWalker, CTypeHintWalker)
    assert one._fTypeHintWalker._fGeneralNodeWalker is one._fNodeWalker
    for name in ("_fNodeWalker", "_fTypeHintWalker"):
        with pytest.raises(AttributeError):
            setattr(one, name, None)


def test_forwarded_operations() -> None:
    one = analyzer()
    assert one.ParseToNode(logical=line_of("x"), in_async_def=False).fText == "x"
    assert one.ParseTokenListToNode(["x"], in_async_def=False).fText == "x"
    assert [node.GetName().fText for node in one.GetTypeParameterNodes(("def", "f", "[", "T", "]"))] == ["T"]
    with pytest.raises(TypeError, match="'NoneType' object is not iterable"):
        one.ParseTokenListToNode(None, False)
    with pytest.raises(TypeError, match="Expected list, got tuple"):
        one.ParseTokenListToNode(("x",), False)


@pytest.mark.parametrize("version", [[3, 8], 3, "3.8"])
def test_a_version_is_a_tuple(version: object) -> None:
    with pytest.raises(TypeError, match="Expected tuple, got "):
        CPGenAnalyzerImpl(version)
    with pytest.raises(TypeError, match="Expected tuple, got "):
        CPGenParserImpl(version)


def test_both_grammars_are_served() -> None:
    old = analyzer((2, 7))
    line = line_of("print 'x', y", (2, 7))
    assert old.AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"y", kGetPrefix)]
    assert isinstance(analyzer().AnalyzeSingleLogical(line_of("print 'x', y"), False), SyntaxError)
    with pytest.raises(OSError, match="no such grammar"):
        CPGenAnalyzerImpl((3, 8), "/no such grammar")
    assert CPGenParserImpl((2, 7), grammar_file=kPy2DefaultGrammar)._fPy3Grammar is True


def test_many_lines_of_one_source_share_their_records_without_mixing() -> None:
    lines = GetLogicalsFromText("a = b\nc = d\ndef f(e): pass\n", (3, 8))
    for line in reversed(lines):
        assert analyzer().AnalyzeSingleLogical(line, False) is None
    lines[0].AppendTypeEquiv(b"late", b"info")
    assert lines[0].fTypeEquivs == [(b"a", kSetPrefix), (b"a", b"b"), (b"b", kGetPrefix), (b"late", b"info")]
    assert lines[1].fTypeEquivs == [(b"c", kSetPrefix), (b"c", b"d"), (b"d", kGetPrefix)]
    assert lines[2].fArgTypeEquivs == [(b"e", kSetPrefix)]
