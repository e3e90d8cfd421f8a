"""The record of a logical line as a host sees it, builds it and derives from it."""

from __future__ import annotations

import gc

import pytest

from lines import analyzer, line_of
from quillet import _fastaccess, logicalline, utils
from quillet.logicalinspect import TextFromTokens
from quillet.logicalline import CLogicalLine, FindMatchOrCaseType, GetLogicalsFromText, IsScopeStartLogical

KINDS = [name for name in logicalline.__all__ if name.startswith("k") and name != "kErrorTokenPrefix"]


def test_kinds_are_distinct_texts() -> None:
    values = [getattr(logicalline, name) for name in KINDS]
    assert len(KINDS) == 32
    assert all(isinstance(value, str) and value for value in values)
    assert len(set(values)) == len(values)
    assert isinstance(logicalline.kErrorTokenPrefix, str)


def test_a_new_line_is_empty() -> None:
    line = CLogicalLine()
    assert line.fType == logicalline.kUnknown
    assert (line.fToks, line.fPositions, line.fTokTypes) == ((), (), [])
    assert (line.fParsed, line.fFirstLine, line.fTokenCount) == (False, 0, 0)
    assert line.fTypeEquivs is None
    assert line.fArgTypeEquivs is None
    assert line.GetExpLogicals() == ()
    line.ClearDerivedInfo()
    assert line.fTypeEquivs is None


def test_a_line_is_built_field_by_field() -> None:
    line = CLogicalLine("mine", ["x", None, "=", "1"], [(0, 0), (0, 1), (0, 2), [0, 4]], first_line=7)
    assert line.fType == "mine"
    assert line.fToks == ("x", None, "=", "1")
    assert line.fPositions == ((0, 0), (0, 1), (0, 2), [0, 4])
    assert line.fTokenCount == 4
    assert line.fFirstLine == 7
    assert line.fTokTypes == [1, None, 22, 2]
    line.fType = logicalline.kAssignment
    line.fParsed = 1
    line.fTokenCount = 2
    line.fToks = iter(["y"])
    line.fFirstLine = 9
    assert (line.fType, line.fParsed, line.fTokenCount, line.fToks) == (logicalline.kAssignment, True, 2, ("y",))
    assert line.fFirstLine == 9


def test_the_token_count_follows_the_tokens_until_it_is_set() -> None:
    line = CLogicalLine()
    line.fToks = ("a", "b")
    assert line.fTokenCount == 2
    line.fTokenCount = 5
    line.fToks = ("a",)
    assert line.fTokenCount == 5
    with pytest.raises(OverflowError, match="value too large to convert to int"):
        line.fTokenCount = 1 << 31
    with pytest.raises(TypeError, match="an integer is required"):
        line.fTokenCount = "2"


@pytest.mark.parametrize(
    ("field", "value", "error", "text"),
    [
        ("fToks", (b"x",), TypeError, "Expected str, got bytes"),
        ("fToks", (1,), TypeError, "Expected str, got int"),
        ("fToks", None, TypeError, "'NoneType' object is not iterable"),
        ("fType", b"x", TypeError, "Expected str, got bytes"),
        ("fPositions", ((0, 0, 0),), ValueError, "too many values to unpack"),
        ("fPositions", ((0,),), ValueError, "need more than 1 value to unpack"),
        ("fPositions", (0,), TypeError, "not iterable"),
        ("fTypeEquivs", (), TypeError, "Expected list, got tuple"),
        ("fArgTypeEquivs", (), TypeError, "Expected list, got tuple"),
    ],
)
def test_fields_take_their_own_type(field: str, value: object, error: type[Exception], text: str) -> None:
    line = line_of("x = 1")
    before = getattr(line, field)
    with pytest.raises(error, match=text):
        setattr(line, field, value)
    assert getattr(line, field) == before


def test_token_types_are_those_of_the_contract() -> None:
    line = CLogicalLine(toks=("x", "1", "'s'", ":", ".", "@", "->", "...", ":=", "# c", "\\", "if"))
    assert line.fTokTypes == [1, 2, 3, 11, 23, 50, 51, 52, 53, 202, 203, 1]
    assert [line.GetTokType(i) for i in range(12)] == line.fTokTypes
    assert line.GetTokType(-1) == 1
    with pytest.raises(IndexError):
        line.GetTokType(12)
    line.fTokTypes = [7] * 12
    assert line.GetTokType(0) == 7
    assert _fastaccess.kTokenId_COMMENT == 202


def test_tokens_and_positions_are_tuples_that_stay() -> None:
    line = line_of("x = 1")
    assert line.fToks is line.fToks
    assert line.fPositions is line.fPositions
    given = ("a",)
    line.fToks = given
    assert line.fToks is given


def test_a_record_list_stays_the_same_object_until_it_is_cleared() -> None:
    line = CLogicalLine()
    line.AppendTypeEquiv(b"a", b"1")
    first = line.fTypeEquivs
    line.AppendTypeEquiv(b"b", b"2")
    assert line.fTypeEquivs is first
    assert first == [(b"a", b"1"), (b"b", b"2")]
    line.ClearDerivedInfo()
    assert line.fTypeEquivs is None
    line.AppendTypeEquiv(b"c", b"3")
    assert line.fTypeEquivs == [(b"c", b"3")]
    assert first == [(b"a", b"1"), (b"b", b"2")]


def test_a_list_that_a_host_assigns_is_kept_and_appended_to() -> None:
    line = CLogicalLine()
    given: list[tuple[bytes, bytes]] = [(b"mine", b"0")]
    line.fTypeEquivs = given
    line.AppendTypeEquiv(b"a", b"1")
    assert line.fTypeEquivs is given
    assert given == [(b"mine", b"0"), (b"a", b"1")]
    line.fTypeEquivs = None
    assert line.fTypeEquivs is None
    args: list[tuple[bytes, bytes]] = []
    line.fArgTypeEquivs = args
    line.AppendArgTypeEquiv(b"p", b"2")
    assert args == [(b"p", b"2")]
    assert line.fTypeEquivs is None


def test_assigning_one_list_leaves_the_other() -> None:
    line = CLogicalLine()
    line.AppendTypeEquiv(b"a", b"1")
    line.AppendArgTypeEquiv(b"p", b"2")
    line.fArgTypeEquivs = None
    assert (line.fTypeEquivs, line.fArgTypeEquivs) == ([(b"a", b"1")], None)
    line.AppendArgTypeEquiv(b"q", b"3")
    line.fTypeEquivs = None
    assert (line.fTypeEquivs, line.fArgTypeEquivs) == (None, [(b"q", b"3")])


def test_records_are_bytes() -> None:
    line = CLogicalLine()
    with pytest.raises(TypeError, match="Expected bytes, got str"):
        line.AppendTypeEquiv("a", b"1")
    with pytest.raises(TypeError, match="Expected bytes, got NoneType"):
        line.AppendArgTypeEquiv(b"a", None)
    assert line.fTypeEquivs is None


def test_clearing_leaves_everything_else_alone() -> None:
    line = line_of("def f(x): pass".split(" pass")[0])
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    kept = [
        (name, getattr(line, name))
        for name in ("fToks", "fTokTypes", "fPositions", "fType", "fFirstLine", "fTokenCount")
    ]
    line.ClearDerivedInfo()
    assert line.fParsed
    assert (line.fTypeEquivs, line.fArgTypeEquivs) == (None, None)
    assert kept == [(name, getattr(line, name)) for name, _ in kept]


def test_operations_of_a_subclass_are_honoured_in_their_order() -> None:
    class Line(CLogicalLine):
        def __init__(self, text: str) -> None:
            line = line_of(text)
            super().__init__(line.fType, line.fToks, line.fPositions)
            self.calls: list[tuple[object, ...]] = []

        def AppendTypeEquiv(self, name: bytes, equiv: bytes) -> None:
            self.calls.append(("type", name, equiv))
            super().AppendTypeEquiv(name, equiv)

        def AppendArgTypeEquiv(self, name: bytes, info: bytes) -> None:
            self.calls.append(("arg", name, info))
            super().AppendArgTypeEquiv(name, info)

        def SetParsed(self, parsed: bool) -> None:
            self.calls.append(("parsed", parsed))
            super().SetParsed(parsed)

        def ClearDerivedInfo(self) -> None:
            self.calls.append(("clear",))
            super().ClearDerivedInfo()

        def GetExpLogicals(self) -> tuple[CLogicalLine, ...]:
            self.calls.append(("embedded",))
            return super().GetExpLogicals()

    line = Line("def f(x):")
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.calls == [
        ("parsed", True),
        ("clear",),
        ("type", b"f", b":s:"),
        ("arg", b"x", b":s:"),
        ("embedded",),
    ]
    assert line.fParsed
    assert line.fTypeEquivs == [(b"f", b":s:")]


def test_a_subclass_that_overrides_nothing_behaves_as_its_base() -> None:
    class Line(CLogicalLine):
        pass

    line = Line(toks=("x",), positions=((0, 0),))
    assert analyzer().AnalyzeSingleLogical(line, False) is None
    assert line.fTypeEquivs == [(b"x", b":g:")]


def test_an_uninitialised_line_is_a_type_error() -> None:
    class Line(CLogicalLine):
        def __init__(self) -> None:
            pass

    line = Line()
    for use in (
        lambda: analyzer().AnalyzeSingleLogical(line, False),
        lambda: line.fTypeEquivs,
        lambda: setattr(line, "fArgTypeEquivs", None),
        lambda: line.fToks,
        lambda: line.ClearDerivedInfo(),
    ):
        with pytest.raises(TypeError):
            use()


def test_what_its_constructor_does_not_take_is_a_type_error() -> None:
    with pytest.raises(TypeError):
        CLogicalLine(kind="unknown")  # type: ignore[call-arg]
    with pytest.raises(TypeError):
        CLogicalLine("unknown", (), (), None, False, 0, None, None)  # type: ignore[call-arg]
    with pytest.raises(TypeError, match="Expected str, got int"):
        CLogicalLine(3)  # type: ignore[arg-type]


def test_a_record_list_cannot_be_deleted() -> None:
    line = CLogicalLine()
    with pytest.raises(AttributeError):
        del line.fTypeEquivs
    with pytest.raises(AttributeError):
        del line.fArgTypeEquivs


def test_a_line_keeps_its_source_when_the_others_are_gone() -> None:
    untouched, written_to = GetLogicalsFromText("first = 'some text'\nsecond = first.name\nthird\n", (3, 12))[:2]
    analyzer().AnalyzeSingleLogical(untouched, False)
    written_to.AppendTypeEquiv(b"host", b":g:")
    written_to.AppendTypeEquiv(b"moves", b":g:")
    untouched.AppendTypeEquiv(b"moves", b":g:")  # out of turn
    assert untouched.fToks == ("first", "=", "'some text'")
    assert untouched.fPositions == ((0, 0), (0, 6), (0, 8))
    assert untouched.fTypeEquivs == [(b"first", b":s:"), (b"first", b":l:str: 'some text'"), (b"moves", b":g:")]
    del untouched
    assert written_to.fToks == ("second", "=", "first", ".", "name")
    assert written_to.fTypeEquivs == [(b"host", b":g:"), (b"moves", b":g:")]
    assert analyzer().AnalyzeSingleLogical(written_to, False) is None
    assert written_to.fTypeEquivs is not None
    assert written_to.fTypeEquivs[:2] == [(b"second", b":s:"), (b"second", b"first.name")]


def test_text_is_cut_alike_from_str_and_bytes() -> None:
    text = "x = 'é'\nif x:\n    pass\n"
    for source in (text, text.encode()):
        assert [line.fToks for line in GetLogicalsFromText(source)] == [
            ("x", "=", "'é'"),
            ("if", "x", ":"),
            ("pass",),
        ]
    assert [line.fToks for line in utils.GetLogicalsFromText(text)] == [
        line.fToks for line in GetLogicalsFromText(text)
    ]
    assert [line.fFirstLine for line in GetLogicalsFromText(text)] == [0, 1, 2]
    assert GetLogicalsFromText(text)[0].fPositions == ((0, 0), (0, 2), (0, 4))


def test_the_version_settles_how_an_fstring_ends() -> None:
    text = """f'{a['b']}'"""
    assert line_of(text, (3, 12)).fToks == (text,)
    assert line_of(text, (3, 11)).fToks != (text,)


@pytest.mark.parametrize("bad", [b"x = '\xff\xfe'", b"\xc3( = 1", b"x = 1 # \x80"])
def test_bytes_that_are_no_utf8_read_as_text_and_go_back_unchanged(bad: bytes) -> None:
    (line,) = GetLogicalsFromText(bad)
    assert b"".join((tok or "").encode("utf-8", "surrogateescape") for tok in line.fToks) == bad.replace(b" ", b"") or (
        line.fToks[-1].startswith("#")
    )
    copy = CLogicalLine(line.fType, line.fToks, line.fPositions)
    assert copy.fToks == line.fToks
    assert copy.fTokTypes == line.fTokTypes
    assert TextFromTokens(copy).encode("utf-8", "surrogateescape") == bad


def test_lone_surrogates_of_a_host_are_taken() -> None:
    line = CLogicalLine(toks=("'\ud800'",), positions=((0, 0),))
    assert line.fToks == ("'\ud800'",)
    assert line.fTokTypes == [3]
    assert analyzer().AnalyzeSingleLogical(line, False) is None


@pytest.mark.parametrize(
    ("text", "kind"),
    [
        ("match x:", logicalline.kMatch),
        ("match (x):", logicalline.kMatch),
        ("case x:", logicalline.kCase),
        ("match = 1", logicalline.kUnknown),
        ("match(x)", logicalline.kUnknown),
        ("print(match)", logicalline.kUnknown),
        ("case[x]", logicalline.kUnknown),
    ],
)
def test_soft_keywords(text: str, kind: str) -> None:
    toks = line_of(text).fToks
    assert FindMatchOrCaseType(toks, 0, len(toks)) == kind
    assert FindMatchOrCaseType(list(toks), 0, len(toks)) == kind


@pytest.mark.parametrize(
    ("text", "opens"),
    [("def f():", True), ("async def f():", True), ("class C:", True), ("if x:", False), ("x = 1", False)],
)
def test_lines_that_open_a_scope(text: str, opens: bool) -> None:
    assert IsScopeStartLogical(line_of(text)) is opens


def test_a_line_keeps_its_source_alive() -> None:
    lines = GetLogicalsFromText("a = 'first'\nb = 'second'\n")
    line = lines[1]
    del lines
    gc.collect()
    assert line.fToks == ("b", "=", "'second'")


@pytest.mark.parametrize(
    "text",
    ["x = 1", "f(a,\n  b)", "x = '''a\nb'''", "x = 1  # why", "a + \\\n    b", "é = 'ü'"],
)
def test_the_text_of_a_line_is_as_its_tokens_stand(text: str) -> None:
    line = line_of(text)
    assert TextFromTokens(line) == text

    class Plain:
        fToks = line.fToks
        fPositions = line.fPositions

    assert TextFromTokens(Plain()) == text
