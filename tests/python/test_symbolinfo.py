"""The vocabulary of records as a host reads and composes it."""

from __future__ import annotations

import ast
import re
import warnings
from pathlib import Path

import pytest

from quillet import symbolinfo
from quillet._fastaccess import CStringTokenizer

ROOT = Path(__file__).resolve().parent.parent.parent
ROWS = (ROOT / "core/vocabulary/kinds.def").read_text()
KINDS = re.findall(r"^QUILLET_INFO_KIND\((\w+), ", ROWS, re.MULTILINE)


# ---- constants ----


@pytest.mark.parametrize("name", KINDS)
def test_a_prefix_holds_its_kind(name):
    prefix = getattr(symbolinfo, f"k{name}Prefix")
    kind = getattr(symbolinfo, f"k{name}Kind")
    assert isinstance(prefix, bytes)
    assert len(prefix) == symbolinfo.kPrefixLen
    assert prefix[0] == ord(":")
    assert prefix[1] == kind != 0
    assert symbolinfo.GetInfoBytesKind(prefix) == kind
    assert symbolinfo.GetInfoBytesKind(prefix + b"detail") == kind


def test_kinds_are_distinct():
    kinds = [getattr(symbolinfo, f"k{name}Kind") for name in KINDS] + [symbolinfo.kPlainEquivKind]
    assert len(set(kinds)) == len(kinds)


def test_no_constant_is_missing():
    found = {name[1:-6] for name in vars(symbolinfo) if name.startswith("k") and name.endswith("Prefix")}
    assert found == set(KINDS)
    assert {"Set", "TypeHint", "GenericTypeAlias"} < found
    assert symbolinfo.kPrefixLen >= 2
    for name in ("kPlainEquivSpec", "kIterationSubscript"):
        assert isinstance(getattr(symbolinfo, name), bytes)
    for name in (
        "kClassInstanceSuffix kScopeIndexSep kModuleScopeName kWildcardScope kDefLineScopeName _kDotLineScopeName"
    ).split():
        assert isinstance(getattr(symbolinfo, name), str)
    for name in ("kTypingModuleSymbol", "kTypingModuleSymbolDot", "kTypingModuleSymbolDotAny"):
        value = getattr(symbolinfo, name)
        assert isinstance(value, bytes)
        assert getattr(symbolinfo, f"{name}Str") == value.decode()


# ---- small decoders ----


@pytest.mark.parametrize("info", [b"a.b.c()", b"", b":", b":\0x", b"x:s:"])
def test_without_a_prefix_an_info_is_plain(info):
    assert symbolinfo.GetInfoBytesKind(info) == symbolinfo.kPlainEquivKind


def test_an_info_is_bytes():
    for wrong in ("a", None):
        with pytest.raises(TypeError):
            symbolinfo.GetInfoBytesKind(wrong)


def test_def_kinds():
    found = {name for name in KINDS if symbolinfo.IsDefKind(getattr(symbolinfo, f"k{name}Kind"))}
    assert found == {"Function", "Method", "UnboundMethod"}
    assert not symbolinfo.IsDefKind(symbolinfo.kClassKind)
    assert not symbolinfo.IsDefKind(0)


def test_def_line_scopes():
    end = symbolinfo._kDotLineScopeName
    assert symbolinfo.IsDefLineScope("a.b" + end)
    assert not symbolinfo.IsDefLineScope("a.b")
    for wrong in (None, b"a", 1):
        with pytest.raises(TypeError):
            symbolinfo.IsDefLineScope(wrong)


def test_parents_of_def_line_scopes_are_told_by_length():
    length = len(symbolinfo._kDotLineScopeName)
    assert symbolinfo.IsParentOfDefLineScope("abc", "x" * (3 + length))
    assert symbolinfo.IsParentOfDefLineScope("äöü", "x" * (3 + length)), "lengths are in characters"
    assert symbolinfo.IsParentOfDefLineScope("", "x" * length)
    assert not symbolinfo.IsParentOfDefLineScope("abc", "x" * (4 + length))
    for wrong in ((None, "abc"), ("abc", None)):
        with pytest.raises(TypeError, match="has no len"):
            symbolinfo.IsParentOfDefLineScope(*wrong)
    for wrong in ((b"abc", "abc"), ("abc", ["a"])):
        with pytest.raises(TypeError, match="Expected str"):
            symbolinfo.IsParentOfDefLineScope(*wrong)


def test_the_module_is_the_empty_scope():
    assert symbolinfo.IsTopLevelModuleScope("")
    assert symbolinfo.IsTopLevelModuleScope(symbolinfo.kModuleScopeName)
    assert not symbolinfo.IsTopLevelModuleScope("a")


def test_kind_filter():
    matches = symbolinfo.CKindFilter([symbolinfo.kSetKind, 255])
    assert matches.KindMatches(symbolinfo.kSetKind)
    assert matches.KindMatches(255)
    assert not matches.KindMatches(symbolinfo.kGetKind)
    assert not symbolinfo.CKindFilter().KindMatches(symbolinfo.kSetKind)
    for wrong in (256, -1):
        with pytest.raises(OverflowError):
            matches.KindMatches(wrong)
        with pytest.raises(OverflowError):
            symbolinfo.CKindFilter([wrong])


def test_the_builtin_location_is_loaded_once():
    class Cache(symbolinfo.CLocationCache):
        loads = 0

        def _LoadBuiltinLoc(self):
            self.loads += 1
            self._fBuiltinLoc = ["builtins", self.loads]

    cache = Cache()
    assert cache._fBuiltinLoc is None
    first = cache.GetBuiltinLoc()
    assert first == ["builtins", 1]
    assert cache.GetBuiltinLoc() is first
    assert cache.loads == 1


def test_the_builtin_location_of_the_host():
    assert symbolinfo.CLocationCache().GetBuiltinLoc() == symbolinfo.kBuiltinModulePrefix + b"builtins"


# ---- composing ----


def test_literal_infos():
    build = symbolinfo.BuildLiteralInfo
    assert build("int", b"1") == symbolinfo.kTypedLiteralPrefix + b"int: 1"
    assert build("list", None) == symbolinfo.kTypedLiteralPrefix + b"list:"
    assert build("None", "None") == symbolinfo.kTypedLiteralPrefix + b"None: None"
    for wrong in ((None, b""), ("int", 1)):
        with pytest.raises(TypeError):
            build(*wrong)


def test_instance_names():
    name = symbolinfo.GetInstanceNameForClass("a.b.C")
    assert name == "a.b.C" + symbolinfo.kClassInstanceSuffix
    assert symbolinfo.GetInstanceNameForClass(b"a.b.C") == name.encode()
    assert name.endswith(":")
    with pytest.raises(TypeError):
        symbolinfo.GetInstanceNameForClass(None)


def test_a_string_literal_behind_an_instance_name_is_a_typed_literal():
    instance = symbolinfo.kTypedLiteralPrefix + symbolinfo.GetInstanceNameForClass(b"str")
    info = instance + b" " + symbolinfo.EncodeStringLiteral("'a: b'")
    at = info.find(b": ", symbolinfo.kPrefixLen)
    assert info[at + 2 :] == b"'a: b'"
    assert symbolinfo.DecodeInfo(info) == ("TypedLiteral", ("str", "'a: b'"))


def test_scope_names():
    assert symbolinfo.EnsureScopeNameIndicies("list") == "list"
    assert symbolinfo.EnsureScopeNameIndicies("a#0.b#1") == "a.b#1"


def test_argument_infos():
    assert symbolinfo.BuildArgInfo(0, None) == symbolinfo.kArgPrefix + b"0"
    assert symbolinfo.BuildArgInfo(12, b":h:int") == symbolinfo.kArgPrefix + b"12 :h:int"
    with pytest.raises(TypeError):
        symbolinfo.BuildArgInfo("0", None)


def test_the_builder():
    builder = symbolinfo.gInfoBytesBuilder
    assert isinstance(builder, symbolinfo.CInfoBytesBuilder)
    builder.Clear()
    builder.Append(symbolinfo.kArgPrefix)
    builder.AppendInteger(-3)
    builder.Append("é")
    assert builder.GetBytes() == symbolinfo.kArgPrefix + b"-3\xc3\xa9"
    builder.Clear()
    assert builder.GetBytes() == b""


# ---- joining ----


def tokens_of(text):
    tokenizer = CStringTokenizer(text)
    tokens = []
    while not tokenizer.IsAtEnd():
        tokens.append(tokenizer.GetToken())
        tokenizer.Advance()
    return tokens


@pytest.mark.parametrize(
    "text",
    [
        "a + b",
        "not x",
        "f(b=1)",
        "x[1:2]",
        "-x",
        "{k: v}",
        "lambda x: x",
        "f(*a, **k)",
        "a if b else c",
        "[x for x in y]",
        "await x",
        "yield x",
        "a.b(c)[d](e)",
        "(a := b)",
        "1 .real",
        "a not in b",
        "x is not None",
        "`a`",
        "r'x' 'y'",
        "é[ñ]",
    ],
)
def test_joining_reads_as_a_person_writes(text):
    assert symbolinfo.JoinTokens(tokens_of(text)) == text.encode()
    assert symbolinfo.JoinTokens(tuple(token.encode() for token in tokens_of(text))) == text.encode()


def test_joining_takes_items():
    assert symbolinfo.JoinTokens([]) == b""
    assert symbolinfo.JoinTokens(["{", b"k:v", "}"]) == b"{k: v}"
    for wrong in ([1], [None], None, 1):
        with pytest.raises(TypeError):
            symbolinfo.JoinTokens(wrong)


def test_joined_expressions_mean_the_same_to_the_host():
    with open(ast.__file__, "rb") as source:
        tree = ast.parse(source.read())
    compared = 0
    for node in ast.walk(tree):
        # Parts of a subscript and of an f-string are no expressions by themselves.
        if not isinstance(node, ast.expr) or isinstance(node, (ast.Slice, ast.FormattedValue, ast.JoinedStr)):
            continue
        if isinstance(node, ast.Tuple) and any(isinstance(element, ast.Slice) for element in node.elts):
            continue
        text = ast.unparse(node)
        joined = symbolinfo.JoinTokens(tokens_of(text)).decode()
        assert ast.dump(ast.parse(joined)) == ast.dump(ast.parse(text)), joined
        compared += 1
    assert compared > 1000


# ---- string literals ----

LITERALS = [
    "''",
    "'abc'",
    '"it\'s"',
    "'''a\nb'''",
    '"""a\r\nb\rc"""',
    "'a\\\nb'",
    "'tab\there'",
    r"'\a\b\f\n\r\t\v\\\'\"'",
    r"'\0\12\101\377\400\777'",
    r"'\x41\u00e9\U0001F600\N{BULLET}'",
    r"'\d\é\8'",
    "'\\\t'",
    "r'\\d'",
    "R'''a\\'\n\\\\\t'''",
    "u'é'",
    "'é€😀'",
    r"b'\x00\xff\d\u0041\101'",
    "b'''a\nb'''",
    "br'\\d'",
    "Rb'''\\d\n'''",
    "'\x0c\x7f\x01'",
]


@pytest.mark.parametrize("text", LITERALS)
def test_the_value_of_a_literal_is_the_hosts(text):
    with warnings.catch_warnings():
        warnings.simplefilter("ignore")
        expected = ast.literal_eval(text)
    with warnings.catch_warnings():
        warnings.simplefilter("error")  # escapes of other people's source are no news
        value = symbolinfo.ObjectForStringLiteral(text)
    assert value == expected
    assert type(value) is type(expected)


@pytest.mark.parametrize(
    ("text", "value"),
    [
        ("ur'\\u0041\\d'", "A\\d"),
        ("UR'\\\\u0041'", "\\\\u0041"),
        ("ur'\\U0001F600'", "😀"),
        ("b'é'", "é".encode()),
        (r"b'\400'", b"\0"),
    ],
)
def test_the_value_of_a_literal_of_python_2(text, value):
    assert symbolinfo.ObjectForStringLiteral(text) == value


@pytest.mark.parametrize("text", ["f'{a}'", "rf'a'", "abc", "'open", "", "'a' 'b'", "1"])
def test_what_has_no_constant_value(text):
    with pytest.raises(ValueError, match=r"^not a constant string literal: "):
        symbolinfo.ObjectForStringLiteral(text)


@pytest.mark.parametrize("text", [r"'\x1'", r"b'\x'", r"'\N{no such}'", r"'\u12'"])
def test_a_broken_escape_is_the_hosts_error(text):
    with pytest.raises(UnicodeDecodeError):
        symbolinfo.ObjectForStringLiteral(text)


@pytest.mark.parametrize("text", LITERALS)
def test_an_encoded_literal_has_the_same_value_on_one_line(text):
    encoded = symbolinfo.EncodeStringLiteral(text)
    assert all(0x20 <= byte != 0x7F for byte in encoded)
    assert symbolinfo.ObjectForStringLiteral(encoded.decode()) == symbolinfo.ObjectForStringLiteral(text)
    if all(0x20 <= byte != 0x7F for byte in text.encode()):
        assert encoded == text.encode()


def test_the_raw_unicode_literal_of_python_2_keeps_its_value_on_one_line():
    text = "ur'''\\u0041\\d\n\\\\u0042\t'''"
    encoded = symbolinfo.EncodeStringLiteral(text).decode()
    assert symbolinfo.ObjectForStringLiteral(encoded) == symbolinfo.ObjectForStringLiteral(text)
    assert "\n" not in encoded


# ---- decoding ----


@pytest.mark.parametrize(
    ("info", "decoded"),
    [
        (symbolinfo.kSetPrefix, ("Set", None)),
        (symbolinfo.kGetPrefix, ("Get", None)),
        (symbolinfo.kGlobalPrefix, ("Global", None)),
        (symbolinfo.kNonlocalPrefix, ("Nonlocal", None)),
        (symbolinfo.kWithinExprPrefix + b"12", ("WithinExpr", 12)),
        (symbolinfo.kWithinExprPrefix + b"x", ("WithinExpr", "x")),
        (symbolinfo.kCalledPrefix + b"(a,1)", ("Called", "(a,1)")),
        (symbolinfo.kImportPrefix + b"os.path", ("Import", "os.path")),
        (symbolinfo.kFromImportPrefix + b"a.b c", ("FromImport", ("a.b", "c"))),
        (symbolinfo.kFromImportPrefix + b". *", ("FromImport", (".", "*"))),
        (symbolinfo.kImportAsNamePrefix + b"np", ("ImportAsName", "np")),
        (symbolinfo.kTypeParameterPrefix, ("TypeParameter", (None, None))),
        (symbolinfo.kTypeParameterPrefix + b"int", ("TypeParameter", (None, "int"))),
        (symbolinfo.kTypeParameterPrefix + b"**", ("TypeParameter", ("**", None))),
        (symbolinfo.kTypeParameterPrefix + b"* int", ("TypeParameter", ("*", "int"))),
        (symbolinfo.kExpressionEquivPrefix + b"a + b", ("ExpressionEquiv", "a + b")),
        (symbolinfo.kTypedLiteralPrefix + b"bool: True", ("TypedLiteral", ("bool", "True"))),
        (symbolinfo.kTypedLiteralPrefix + b"list:", ("TypedLiteral", ("list", None))),
        (symbolinfo.kTypeHintPrefix + b"List[int]", ("TypeHint", "List[int]")),
        (symbolinfo.kArgPrefix + b"3", ("Arg", (3, None))),
        (symbolinfo.kArgPrefix + b"3 :h:int", ("Arg", (3, b":h:int"))),
        (b"a.C:", ("Instance", "a.C")),
        (b"a.b()[0]", ("PlainEquiv", "a.b()[0]")),
        (b"", ("PlainEquiv", "")),
        (b"from x.y", ("YieldFrom", ("PlainEquiv", "x.y"))),
        (b"from " + symbolinfo.kTypedLiteralPrefix + b"list:", ("YieldFrom", ("TypedLiteral", ("list", None)))),
        (b"from " * 10000, ("YieldFrom", "from " * 9999)),
        (symbolinfo.kClassPrefix + b"a.B", ("Class", "a.B")),
        (b":\x01:x", ("Unknown", "x")),
        (b"\xff", ("PlainEquiv", "\udcff")),
    ],
)
def test_decoding(info, decoded):
    assert symbolinfo.DecodeInfo(info) == decoded
