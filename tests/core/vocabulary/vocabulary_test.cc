// The vocabulary of records: prefixes, composing, joining, decoding.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "tokens/string_tokenizer.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {
namespace {

struct KindRow {
  Text name;
  char kind;
  Text prefix;
};

constexpr KindRow kKinds[] = {
#define QUILLET_INFO_KIND(name, byte) {#name, k##name##Kind, k##name##Prefix},
#include "vocabulary/kinds.def"
};

// What one of the appending operations appends.
template <class Append, class... Args>
std::string Composed(Append append, Args... args) {
  std::string out;
  append(args..., out);
  return out;
}

std::string Encoded(Text literal) { return Composed(AppendEncodedStringLiteral, literal); }

std::string Joined(const std::vector<std::string>& items) {
  const std::vector<Text> views(items.begin(), items.end());
  std::string out;
  AppendJoinedTokens(views.data(), views.size(), out);
  return out;
}

std::vector<std::string> TokensOf(Text text) {
  std::vector<std::string> tokens;
  for (CStringTokenizer tokenizer(text); !tokenizer.AtEnd(); tokenizer.Advance()) {
    tokens.emplace_back(tokenizer.Current());
  }
  return tokens;
}

// ---- prefixes and kinds ----

TEST(InfoKinds, PrefixesHoldTheirKindAndHaveOneLength) {
  std::set<char> kinds = {kPlainEquivKind};
  for (const KindRow& row : kKinds) {
    EXPECT_NE(row.kind, '\0') << row.name;
    EXPECT_TRUE(kinds.insert(row.kind).second) << row.name;
    EXPECT_EQ(static_cast<int64_t>(row.prefix.size()), kPrefixLen) << row.name;
    EXPECT_EQ(row.prefix[0], ':') << row.name;
    EXPECT_EQ(row.prefix[1], row.kind) << row.name;
    EXPECT_EQ(GetInfoBytesKind(row.prefix), row.kind) << row.name;
    EXPECT_EQ(NameOfInfoKind(row.kind), row.name);
  }
}

TEST(GetInfoBytesKind, IsPlainWithoutAPrefix) {
  EXPECT_EQ(GetInfoBytesKind("a.b.c()"), kPlainEquivKind);
  EXPECT_EQ(GetInfoBytesKind(""), kPlainEquivKind);
  EXPECT_EQ(GetInfoBytesKind(":"), kPlainEquivKind);
  EXPECT_EQ(GetInfoBytesKind(Text(":\0:", 3)), kPlainEquivKind);
}

TEST(GetInfoBytesKind, TakesAnyByteBehindAColonForAKind) { EXPECT_EQ(GetInfoBytesKind(":\x01"), '\x01'); }

TEST(GetInfoBytesKind, ReadsTheSetPrefix) { EXPECT_EQ(GetInfoBytesKind(kSetPrefix), kSetKind); }

TEST(IsDefKind, HoldsForFunctionsAndMethodsAlone) {
  std::set<Text> def_kinds;
  for (const KindRow& row : kKinds) {
    if (IsDefKind(row.kind)) def_kinds.insert(row.name);
  }
  EXPECT_EQ(def_kinds, (std::set<Text>{"Function", "Method", "UnboundMethod"}));
  EXPECT_FALSE(IsDefKind(kClassKind));
}

TEST(KindFilter, AnswersByTheFlagOfTheKind) {
  CKindFilter filter;
  filter.flags[static_cast<uint8_t>(kSetKind)] = 1;
  filter.flags[0xFF] = -1;
  EXPECT_TRUE(filter.KindMatches(kSetKind));
  EXPECT_TRUE(filter.KindMatches('\xFF'));
  EXPECT_FALSE(filter.KindMatches(kGetKind));
}

// ---- scopes ----

TEST(Scopes, ADefLineScopeIsToldByItsEnd) {
  EXPECT_TRUE(IsDefLineScope("a.b" + std::string(kDotLineScopeName)));
  EXPECT_TRUE(IsDefLineScope(kDotLineScopeName));
  EXPECT_FALSE(IsDefLineScope("a.b"));
  EXPECT_FALSE(IsDefLineScope(kDefLineScopeName)) << "without the dot it is no part of another scope";
}

TEST(Scopes, OnlyTheLengthsOfParentAndDefLineScopeCount) {
  const size_t length = kDotLineScopeName.size();
  EXPECT_TRUE(IsParentOfDefLineScope(3, 3 + length));
  EXPECT_TRUE(IsParentOfDefLineScope(0, length));
  EXPECT_FALSE(IsParentOfDefLineScope(3, 4 + length));
}

TEST(Scopes, TheModuleIsTheEmptyScope) {
  EXPECT_TRUE(IsTopLevelModuleScope(""));
  EXPECT_FALSE(IsTopLevelModuleScope("a"));
}

TEST(EnsureScopeNameIndicies, DropsTheIndexOfAFirstDefinition) {
  EXPECT_EQ(EnsureScopeNameIndicies("list"), "list");
  EXPECT_EQ(EnsureScopeNameIndicies("f#0"), "f");
  EXPECT_EQ(EnsureScopeNameIndicies("f#1"), "f#1");
  EXPECT_EQ(EnsureScopeNameIndicies("a#0.b#10.c#0"), "a.b#10.c");
  EXPECT_EQ(EnsureScopeNameIndicies(""), "");
  EXPECT_EQ(EnsureScopeNameIndicies("a."), "a.");
}

// ---- composing ----

TEST(LiteralInfo, HasTheFormOfATypedLiteral) {
  EXPECT_EQ(Composed(AppendLiteralInfo, "int", "1"), ":l:int: 1");
  EXPECT_EQ(Composed(AppendLiteralInfo, "list", kNoText), kListInstanceName);
  EXPECT_EQ(Composed(AppendLiteralInfo, "None", "None"), ":l:None: None");
  EXPECT_EQ(Composed(AppendLiteralInfo, "tuple", ""), ":l:tuple: ");
}

TEST(LiteralInfo, TheInstanceNamesAreThoseThatComposingGives) {
  const auto instance_name = [](Text cls_name) {
    std::string out(kTypedLiteralPrefix);
    AppendInstanceNameForClass(EnsureScopeNameIndicies(cls_name), out);
    return out;
  };
  EXPECT_EQ(instance_name("list"), kListInstanceName);
  EXPECT_EQ(instance_name("dict"), kDictInstanceName);
  EXPECT_EQ(instance_name("set"), kSetInstanceName);
  EXPECT_EQ(instance_name("tuple"), kTupleInstanceName);
  EXPECT_EQ(instance_name("str"), kStringInstanceName);
  EXPECT_EQ(instance_name("unicode"), kUnicodeInstanceName);
  EXPECT_EQ(instance_name("bytes"), kBytesInstanceName);
  EXPECT_EQ(instance_name("int"), kIntLiteralName);
  EXPECT_EQ(instance_name("float"), kFloatLiteralName);
}

TEST(InstanceName, EndsInTheSuffixThatALiteralCanFollow) {
  const std::string name = Composed(AppendInstanceNameForClass, "a.b.C");
  EXPECT_EQ(name, "a.b.C:");
  EXPECT_EQ(GetInfoBytesKind(name), kPlainEquivKind);
}

TEST(ArgInfo, NamesAParameterByItsPlace) {
  EXPECT_EQ(Composed(AppendArgInfo, 0, kNoText), ":A:0");
  EXPECT_EQ(Composed(AppendArgInfo, 12, ":h:int"), ":A:12 :h:int");
}

// ---- string literals ----

TEST(EncodedStringLiteral, IsTheLiteralItselfWithoutControlCharacters) {
  for (const Text literal : {"'abc'", "u\"x\\ny\"", "r'a\\d'", "b''", "'\xC3\xA9'", "f'{x!r}'", ""}) {
    EXPECT_EQ(Encoded(literal), literal);
  }
}

TEST(EncodedStringLiteral, MakesOneLine) {
  EXPECT_EQ(Encoded("'''a\nb'''"), "'''a\\nb'''");
  EXPECT_EQ(Encoded("\"\"\"a\r\nb\rc\"\"\""), "\"\"\"a\\nb\\nc\"\"\"");
}

TEST(EncodedStringLiteral, AnEscapedLineEndDisappears) {
  EXPECT_EQ(Encoded("'a\\\nb'"), "'ab'");
  EXPECT_EQ(Encoded("'a\\\r\nb'"), "'ab'");
  EXPECT_EQ(Encoded("'a\\\\\tb'"), "'a\\\\\\tb'") << "the first backslash escapes the second";
}

TEST(EncodedStringLiteral, EscapesControlCharacters) {
  EXPECT_EQ(Encoded("'a\tb'"), "'a\\tb'");
  EXPECT_EQ(Encoded("'\f\x7f\x01'"), "'\\x0c\\x7f\\x01'");
  EXPECT_EQ(Encoded(Text("'\0'", 3)), "'\\x00'");
}

TEST(EncodedStringLiteral, ABackslashInFrontOfAControlCharacterStaysInTheValue) {
  EXPECT_EQ(Encoded("'\\\t'"), "'\\\\\\t'");
}

TEST(EncodedStringLiteral, RespellsARawLiteralAsACookedOne) {
  EXPECT_EQ(Encoded("r'''\\d\n'''"), "'''\\\\d\\n'''");
  EXPECT_EQ(Encoded("bR'a\\'\t'"), "b'a\\\\\\'\\t'");
  EXPECT_EQ(Encoded("r'\\\\'"), "r'\\\\'") << "nothing to escape";
  EXPECT_EQ(Encoded("r'\\\\\t'"), "'\\\\\\\\\\t'");
}

TEST(EncodedStringLiteral, KeepsTheEscapesThatARawUnicodeLiteralDecodes) {
  EXPECT_EQ(Encoded("ur'\\u0041\\d\t'"), "u'\\u0041\\\\d\\t'");
  EXPECT_EQ(Encoded("ur'\\\\u0041\t'"), "u'\\\\\\\\u0041\\t'");
}

TEST(EncodedStringLiteral, JoinsTheLinesOfAFieldWithABlank) {
  EXPECT_EQ(Encoded("f'''{a\n+ b}\n'''"), "f'''{a + b}\\n'''");
  EXPECT_EQ(Encoded("f'''{{\n}}{a:{b\n}}\n'''"), "f'''{{\\n}}{a:{b }}\\n'''");
}

TEST(EncodedStringLiteral, HoldsNoControlCharacterWhateverTheInput) {
  std::mt19937 random(1);
  const std::string alphabet("'\"\\\n\r\t\0rfbu{}ax", 15);
  for (int round = 0; round < 20000; ++round) {
    std::string literal;
    for (size_t i = random() % 12; i > 0; --i) literal += alphabet[random() % alphabet.size()];
    for (const char byte : Encoded(literal)) ASSERT_TRUE(static_cast<unsigned char>(byte) >= 0x20 && byte != 0x7f);
  }
}

// ---- joining ----

// The text is what joining its own tokens gives.
class JoinedAsWritten : public testing::TestWithParam<const char*> {};

TEST_P(JoinedAsWritten, ReadsAsAPersonWritesIt) { EXPECT_EQ(Joined(TokensOf(GetParam())), GetParam()); }

INSTANTIATE_TEST_SUITE_P(
    Expressions, JoinedAsWritten,
    testing::Values("a", "a + b", "a - -b", "-x", "+1.0", "~x", "not x", "not -x", "a not in b", "a is not b",
                    "a < b <= c != d", "a <> b", "a if b else c", "a ** -b", "a @ b", "a // b % c", "a << 1 | b >> 2",
                    "a.b.c", "a.b()[0].c", "f(x)(y)", "f()", "f(a, b=1, *c, **d)", "f(*a, **k)", "f(x=-1)", "f(-x)",
                    "x[0]", "x[1:2]", "x[a:b:c]", "x[:-1]", "x[::2]", "x[:, 1]", "x[...]", "x[..., 0]", "x[a + 1:]",
                    "[]", "[1, 2]", "[x for x in y if z]", "[-x, not y]", "{}", "{k: v}", "{k: v, **m}", "{1, 2}",
                    "{k: v for k, v in m}", "{k: x[1:2]}", "()", "(a,)", "(a, b)", "(x for x in y)", "lambda: 0",
                    "lambda x: x", "lambda x, y=1, *a, **k: x + y", "lambda *, k: k", "{k: lambda x: x}",
                    "x[lambda: 0]", "f(lambda: 0, a)", "await x", "await (x)", "yield", "(yield)", "(yield x)",
                    "yield from x", "async for x in y", "(a := b)", "x[a := 1]", "1 .real", "1.0.real", ".5.real",
                    "1 if x else 2", "\"a\" 'b'", "\"a\".join(b)", "'%s' % x", "print(x)", "x.match(y)", "`a + b`",
                    "f(`a`)", "def f(a, b: int = 1, /, c=2) -> int:", "(a: Dict[int, str] = x, b=1)", "@a.b(c)",
                    "from . import a, b as c", "from .a import b", "raise E from e", "return -1", "a; b",
                    "a and not b or c", "not (a or b)", "x in (1, 2)", "x in [1]", "x if (y) else {z}", ". 5", "None",
                    "a.b[-1:None]", "Callable[[int, str], None]", "*a, b", "**k"));

TEST(JoinedTokens, TakeTextsThatWereJoinedBefore) {
  EXPECT_EQ(Joined({"a.b(c)", "+", "x[1:2]"}), "a.b(c) + x[1:2]");
  EXPECT_EQ(Joined({"x", "not in", "(a, b)"}), "x not in (a, b)");
  EXPECT_EQ(Joined({"(", "a, b", ")"}), "(a, b)");
  EXPECT_EQ(Joined({"a", ":", "b", ":c"}), "a:b:c");
  EXPECT_EQ(Joined({"[", "lambda: x:", "y", "]"}), "[lambda: x:y]");
  EXPECT_EQ(Joined({"(", "lambda", ":", "x:", "y", ")"}), "(lambda: x:y)");
  EXPECT_EQ(Joined({"f", "(x)", ".y"}), "f(x).y");
  EXPECT_EQ(Joined({"not", "-x"}), "not -x");
  EXPECT_EQ(Joined({"[", "x", "for x in y", "]"}), "[x for x in y]");
  EXPECT_EQ(Joined({"x", "=", "lambda y: y"}), "x=lambda y: y");
  EXPECT_EQ(Joined({"-", "1.5"}), "-1.5");
  EXPECT_EQ(Joined({"*", "*a"}), "* *a");
}

TEST(JoinedTokens, GiveThePairsOfADictTheirBlanksInItsBraces) {
  EXPECT_EQ(Joined({"{", Joined({"k", ":", "v"}), "}"}), "{k: v}");
  EXPECT_EQ(Joined({"{", Joined({"k", ":", "v", "for k in y"}), "}"}), "{k: v for k in y}");
  EXPECT_EQ(Joined({"{", Joined({"x[1:2]", ":", "lambda: 0", ",", "':count'", ":", "{a: b}"}), "}"}),
            "{x[1:2]: lambda: 0, ':count': {a: b}}");
}

TEST(JoinedTokens, LeaveStringsInBracesAsTheyAre) {
  EXPECT_EQ(Joined({"{", "f\"{d[\"a:b\"]}\"", "}"}), "{f\"{d[\"a:b\"]}\"}");
  EXPECT_EQ(Joined({"{", "'a:b'", ",", "r\"c:\\\"d:e\"", "}"}), "{'a:b', r\"c:\\\"d:e\"}");
}

TEST(JoinedTokens, AnAsciiBlankInAnItemNeedsNoOther) { EXPECT_EQ(Joined({"( )", " a", "b "}), "( ) a b "); }

TEST(JoinedTokens, OfNothingAreEmpty) {
  EXPECT_EQ(Joined({}), "");
  EXPECT_EQ(Joined({"", "a", "", "b", ""}), "a b");
}

const std::vector<std::string>& Vocabulary() {
  static const std::vector<std::string> vocabulary = [] {
    std::vector<std::string> tokens = {
        "a",      "x1",   "e5",      "j",          "l",      "r",    "b",      "u",           "f",
        "rb",     "ur",   "_",       "\xC3\xA9",   "if",     "else", "not",    "in",          "is",
        "lambda", "for",  "async",   "await",      "yield",  "from", "import", "None",        "print",
        "match",  "0",    "1",       "12",         "1.",     "1.5",  ".5",     "1e5",         "1.e5",
        "1e-5",   "0x1f", "0b1",     "1_0",        "1j",     "1.j",  "10L",    "\"x\"",       "'y'",
        "''",     "\"\"", "'''z'''", "'''p\nq'''", "r'\\''", "b'k'", "f'{a}'", "f'{a:>{b}}'", "u''",
        "'a:b'",  "!",    "$",       "?",          "\x01",   "\xFF", "\xE2"};
#define QUILLET_TOKEN(name, number, text) \
  if (text[0] != '\0') tokens.push_back(text);
#define QUILLET_TOKEN_ALIAS(name, number, text) tokens.push_back(text);
#include "tokens/token_ids.def"
    return tokens;
  }();
  return vocabulary;
}

TEST(JoinedTokens, TheVocabularyIsOfSingleTokens) {
  for (const std::string& token : Vocabulary()) EXPECT_EQ(TokensOf(token), std::vector<std::string>{token});
}

TEST(JoinedTokens, EveryPairTokenisesBack) {
  for (const std::string& a : Vocabulary()) {
    for (const std::string& b : Vocabulary()) {
      const std::vector<std::string> tokens = {a, b};
      ASSERT_EQ(TokensOf(Joined(tokens)), tokens) << Joined(tokens);
    }
  }
}

// Joins random runs of the tokens first, and those again, as text is made node by node.
std::vector<std::string> JoinRuns(const std::vector<std::string>& items, std::mt19937& random) {
  std::vector<std::string> joined;
  for (size_t at = 0; at < items.size();) {
    const size_t size = std::min<size_t>(1 + random() % 3, items.size() - at);
    joined.push_back(Joined({items.begin() + at, items.begin() + at + size}));
    at += size;
  }
  return joined;
}

TEST(JoinedTokens, RandomSequencesTokeniseBackHoweverTheyAreGrouped) {
  std::mt19937 random(20);
  for (int round = 0; round < 60000; ++round) {
    std::vector<std::string> tokens;
    for (size_t i = 1 + random() % 10; i > 0; --i) tokens.push_back(Vocabulary()[random() % Vocabulary().size()]);
    std::vector<std::string> items = tokens;
    for (size_t level = random() % 3; level > 0; --level) items = JoinRuns(items, random);
    const std::string joined = Joined(items);
    ASSERT_EQ(TokensOf(joined), tokens) << joined;
  }
}

TEST(JoinedTokens, TakeTimeInProportionToTheirNumber) {
  std::vector<std::string> tokens;
  for (int i = 0; i < 500000; ++i) {
    tokens.push_back("(");
    tokens.push_back("lambda");
  }
  EXPECT_EQ(Joined(tokens).size(), 500000 * 8u - 1);
}

// ---- decoding ----

struct DecodedRow {
  Text info;
  Text kind;
  Text first;
  Text second;
};

class DecodeInfoOf : public testing::TestWithParam<DecodedRow> {};

TEST_P(DecodeInfoOf, GivesKindAndParts) {
  const DecodedRow& row = GetParam();
  const DecodedInfo decoded = DecodeInfo(row.info);
  EXPECT_EQ(decoded.kind, row.kind);
  EXPECT_EQ(decoded.first, row.first);
  EXPECT_EQ(IsNone(decoded.first), IsNone(row.first));
  EXPECT_EQ(decoded.second, row.second);
  EXPECT_EQ(IsNone(decoded.second), IsNone(row.second));
}

INSTANTIATE_TEST_SUITE_P(
    Forms, DecodeInfoOf,
    testing::Values(
        DecodedRow{":s:", "Set", kNoText, kNoText}, DecodedRow{":g:", "Get", kNoText, kNoText},
        DecodedRow{":G:", "Global", kNoText, kNoText}, DecodedRow{":N:", "Nonlocal", kNoText, kNoText},
        DecodedRow{":w:12", "WithinExpr", "12", kNoText}, DecodedRow{":c:(a,1)", "Called", "(a,1)", kNoText},
        DecodedRow{":i:os.path", "Import", "os.path", kNoText}, DecodedRow{":a:np", "ImportAsName", "np", kNoText},
        DecodedRow{":f:a.b c", "FromImport", "a.b", "c"}, DecodedRow{":f:a.b *", "FromImport", "a.b", "*"},
        DecodedRow{":P:", "TypeParameter", kNoText, kNoText}, DecodedRow{":P:int", "TypeParameter", kNoText, "int"},
        DecodedRow{":P:**", "TypeParameter", "**", kNoText}, DecodedRow{":P:* int", "TypeParameter", "*", "int"},
        DecodedRow{":e:a + b", "ExpressionEquiv", "a + b", kNoText}, DecodedRow{":h:int", "TypeHint", "int", kNoText},
        DecodedRow{":l:int: 1", "TypedLiteral", "int", "1"}, DecodedRow{":l:list:", "TypedLiteral", "list", kNoText},
        DecodedRow{":l:str: 'a: b'", "TypedLiteral", "str", "'a: b'"}, DecodedRow{":A:3", "Arg", "3", kNoText},
        DecodedRow{":A:3 :h:int", "Arg", "3", ":h:int"}, DecodedRow{"a.b.C:", "Instance", "a.b.C", kNoText},
        DecodedRow{"a.b()[0]", "PlainEquiv", "a.b()[0]", kNoText}, DecodedRow{"", "PlainEquiv", "", kNoText},
        DecodedRow{":", "PlainEquiv", ":", kNoText}, DecodedRow{"from x", "YieldFrom", "x", kNoText},
        DecodedRow{"from :l:list: []", "YieldFrom", ":l:list: []", kNoText},
        DecodedRow{":C:a.B", "Class", "a.B", kNoText}, DecodedRow{":\x01:x", "", "x", kNoText}));

TEST(DecodeInfo, ReadsBackWhatComposingMade) {
  EXPECT_EQ(DecodeInfo(Composed(AppendLiteralInfo, "float", "-1.5")).second, "-1.5");
  EXPECT_EQ(DecodeInfo(Composed(AppendArgInfo, 7, ":h:int")).first, "7");
  EXPECT_EQ(DecodeInfo(Composed(AppendInstanceNameForClass, "a.C")).first, "a.C");
}

TEST(DecodeInfo, TakesAnyBytes) {
  std::mt19937 random(3);
  for (int round = 0; round < 20000; ++round) {
    std::string info;
    if (round % 2) info = std::string(kKinds[random() % std::size(kKinds)].prefix);
    for (size_t i = random() % 6; i > 0; --i) info += static_cast<char>(random() % 256);
    const DecodedInfo decoded = DecodeInfo(info);
    for (const Text part : {decoded.first, decoded.second}) {
      ASSERT_TRUE(info.find(part) != std::string::npos);
    }
  }
}

}  // namespace
}  // namespace quillet
