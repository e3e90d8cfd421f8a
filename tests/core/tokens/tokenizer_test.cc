// Tokens: where each begins and ends, its code, and what becomes of bytes that are none.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "lines/cutter.h"
#include "tests/core/support/verify_tokens.h"
#include "tokens/operators.h"
#include "tokens/word_table.h"

namespace quillet {
namespace {

using Texts = std::vector<std::string>;

struct Tokenized {
  Ref<SourceText> source;
  Texts texts;
  std::vector<int> codes;
};

Tokenized Tokenize(Text bytes, Version version = Version::Of(3, 12)) {
  Tokenized result;
  result.source = SourceText::Copy(bytes);
  TokenizeOnly(*result.source, version);
  EXPECT_EQ(VerifyTokens(*result.source), "");
  for (const Token& token : result.source->tokens) {
    result.texts.emplace_back(token.view());
    result.codes.push_back(token.code);
  }
  return result;
}

Texts TextsOf(Text bytes, Version version = Version::Of(3, 12)) { return Tokenize(bytes, version).texts; }

void ExpectOne(Text bytes, int code) {
  const Tokenized result = Tokenize(bytes);
  ASSERT_EQ(result.texts, Texts{std::string(bytes)});
  EXPECT_EQ(result.codes[0], code) << bytes;
  EXPECT_EQ(CodeOfText(bytes), code) << bytes;
}

// ---- names ----

TEST(Names, EveryWordHasItsCodeAndNoOtherNameHasOne) {
#define QUILLET_WORD(identifier, text)                                \
  EXPECT_EQ(CodeOfName(text, sizeof(text) - 1), word::k##identifier); \
  ExpectOne(text, word::k##identifier);
#include "tokens/words.def"
  for (const char* name : {"i", "iff", "If", "continues", "nonlocal_", "none", "__", "Lambda", "yields", "a1"}) {
    ExpectOne(name, tok::NAME);
  }
  EXPECT_EQ(CodeOfName("", 0), tok::NAME);
}

TEST(Names, WordsHaveTheTypeOfNames) {
  EXPECT_EQ(GetTokenType("lambda"), tok::NAME);
  EXPECT_EQ(GetTokenType("x"), tok::NAME);
  EXPECT_EQ(GetTokenType("("), tok::LPAR);
}

TEST(Names, LongerThanOneScanStepAreWhole) {
  for (size_t length : {7, 8, 9, 15, 16, 17, 31, 32, 33, 1000}) ExpectOne(std::string(length, 'x'), tok::NAME);
}

TEST(Names, BeyondAsciiAreWhole) {
  ExpectOne("\xC3\xA9t\xC3\xA9", tok::NAME);
  ExpectOne("a\xC3\xA9", tok::NAME);
  ExpectOne("if\xC3\xA9", tok::NAME);
  EXPECT_EQ(TextsOf("\xC3\xA9 = 1"), (Texts{"\xC3\xA9", "=", "1"}));
}

TEST(Names, MalformedUtf8IsAnErrorTokenPerByte) {
  const Tokenized result = Tokenize("a\xFF\xC3(x");
  EXPECT_EQ(result.texts, (Texts{"a", "\xFF", "\xC3", "(", "x"}));
  EXPECT_EQ(result.codes, (std::vector<int>{tok::NAME, tok::ERRORTOKEN, tok::ERRORTOKEN, tok::LPAR, tok::NAME}));
}

// ---- numbers ----

TEST(Numbers, AllFormsAreOneToken) {
  for (const char* number :
       {"0",     "7",     "1234567890", "1_000_000",   "0_0", "0x1F", "0XFFl", "0x_1f", "0o17",   "0O1_7", "0777",
        "0777L", "0b101", "0B_1",       "10L",         "10l", "1.",   "1.5",   ".5",    "1.5e10", "1e10",  "1E+5",
        "1e-5",  "1.e5",  ".5e-3",      "1_0.0_1e1_0", "3j",  "3J",   "1.5j",  "1e3j",  ".5J",    "09.5",  "09j"}) {
    ExpectOne(number, tok::NUMBER);
  }
}

TEST(Numbers, EndWhereTheirFormEnds) {
  EXPECT_EQ(TextsOf("1if"), (Texts{"1", "if"}));
  EXPECT_EQ(TextsOf("1__0"), (Texts{"1", "__0"}));
  EXPECT_EQ(TextsOf("1_"), (Texts{"1", "_"}));
  EXPECT_EQ(TextsOf("1..real"), (Texts{"1.", ".", "real"}));
  EXPECT_EQ(TextsOf("1else"), (Texts{"1", "else"}));
  EXPECT_EQ(TextsOf("1e+"), (Texts{"1", "e", "+"}));
  EXPECT_EQ(TextsOf("0x"), (Texts{"0", "x"}));
  EXPECT_EQ(TextsOf("0x_"), (Texts{"0", "x_"}));
  EXPECT_EQ(TextsOf("0b12"), (Texts{"0b1", "2"}));
  EXPECT_EQ(TextsOf("0xfor"), (Texts{"0xf", "or"}));
  EXPECT_EQ(TextsOf("1.5L"), (Texts{"1.5", "L"}));
  EXPECT_EQ(TextsOf("1...x"), (Texts{"1.", ".", ".", "x"}));
  EXPECT_EQ(TextsOf("x.5"), (Texts{"x", ".5"}));
}

// ---- operators ----

TEST(Operators, EveryOneHasItsCode) {
#define QUILLET_TOKEN(name, number, text) \
  if (sizeof(text) > 1) ExpectOne(text, tok::name);
#define QUILLET_TOKEN_ALIAS(name, number, text) ExpectOne(text, tok::name);
#include "tokens/token_ids.def"
}

TEST(Operators, TheLongestMatchWins) {
  EXPECT_EQ(TextsOf("a**=b//c>>=d"), (Texts{"a", "**=", "b", "//", "c", ">>=", "d"}));
  EXPECT_EQ(TextsOf("a<>b<=c<<d<e"), (Texts{"a", "<>", "b", "<=", "c", "<<", "d", "<", "e"}));
  EXPECT_EQ(TextsOf("a===b"), (Texts{"a", "==", "=", "b"}));
  EXPECT_EQ(TextsOf("a->b:=c!=d@=e"), (Texts{"a", "->", "b", ":=", "c", "!=", "d", "@=", "e"}));
  EXPECT_EQ(TextsOf("...."), (Texts{"...", "."}));
  EXPECT_EQ(TextsOf(".."), (Texts{".", "."}));
  EXPECT_EQ(TextsOf("`x`"), (Texts{"`", "x", "`"}));
}

// ---- strings ----

TEST(Strings, EveryPrefixIsPartOfItsString) {
  for (const char* prefix : {"",   "r",  "R",  "u",  "U",  "b",  "B",  "f",  "F",  "ur", "uR", "Ur", "br", "bR",
                             "Br", "BR", "rb", "rB", "Rb", "RB", "fr", "fR", "Fr", "FR", "rf", "rF", "Rf", "RF"}) {
    for (const char* body : {"''", "\"\"", "'a'", "\"a'b\"", "'''a'b\n\"'''", "\"\"\"a\"b\n'\"\"\""}) {
      ExpectOne(std::string(prefix) + body, tok::STRING);
    }
  }
}

TEST(Strings, OtherLettersInFrontAreAName) {
  EXPECT_EQ(TextsOf("bu''"), (Texts{"bu", "''"}));
  EXPECT_EQ(TextsOf("ru''"), (Texts{"ru", "''"}));
  EXPECT_EQ(TextsOf("x''"), (Texts{"x", "''"}));
  EXPECT_EQ(TextsOf("rbr''"), (Texts{"rbr", "''"}));
  EXPECT_EQ(TextsOf("bf''"), (Texts{"bf", "''"}));
}

TEST(Strings, ABackslashProtectsAQuoteInRawOnesToo) {
  ExpectOne(R"('\'')", tok::STRING);
  ExpectOne(R"(r'\'')", tok::STRING);
  ExpectOne(R"("\\")", tok::STRING);
  ExpectOne(R"('''\'''')", tok::STRING);
  EXPECT_EQ(TextsOf(R"('\\'x)"), (Texts{R"('\\')", "x"}));
}

TEST(Strings, ABackslashJoinsTheNextLineToAString) {
  for (const char* line_end : {"\n", "\r\n", "\r"}) {
    const std::string text = std::string("'a\\") + line_end + "b'";
    const Tokenized result = Tokenize(text + " c");
    EXPECT_EQ(result.texts, (Texts{text, "c"}));
    EXPECT_EQ(result.source->line_starts.size(), 2u);
  }
}

TEST(Strings, LongOnesEndWhereTheyShould) {
  for (size_t length : {13, 14, 15, 16, 17, 31, 32, 33, 500}) {
    const std::string body(length, 'x');
    EXPECT_EQ(TextsOf("'" + body + "' y"), (Texts{"'" + body + "'", "y"}));
    EXPECT_EQ(TextsOf("'''" + body + "''' y"), (Texts{"'''" + body + "'''", "y"}));
    EXPECT_EQ(TextsOf("#" + body + "\ny"), (Texts{"#" + body, "y"}));
  }
}

TEST(Strings, AnUnclosedOneIsAnErrorToTheEndOfItsLine) {
  const Tokenized result = Tokenize("x = 'abc + d\ny = \"q");
  EXPECT_EQ(result.texts, (Texts{"x", "=", "'abc + d", "y", "=", "\"q"}));
  EXPECT_EQ(result.codes[2], tok::ERRORTOKEN);
  EXPECT_EQ(result.codes[5], tok::ERRORTOKEN);
}

TEST(Strings, AnUnclosedTripleOneIsAnErrorToTheEndOfItsFirstLine) {
  const Tokenized result = Tokenize("x = '''abc\ny = 1\nz = '''d\n\"\"\"doc\n\"\"\"\n");
  EXPECT_EQ(result.texts, (Texts{"x", "=", "'''abc\ny = 1\nz = '''", "d", "\"\"\"doc\n\"\"\""}));
  EXPECT_EQ(TextsOf("'''abc\ny = '''d'''\n"), (Texts{"'''abc\ny = '''", "d", "'''"}));
  EXPECT_EQ(TextsOf("\"\"\"abc\ny = 1\n"), (Texts{"\"\"\"abc", "y", "=", "1"}));
}

TEST(Strings, AnUnclosedOneOverJoinedLinesFailsOnItsFirst) {
  EXPECT_EQ(TextsOf("'a\\\nb\nc"), (Texts{"'a\\", "b", "c"}));
  EXPECT_EQ(TextsOf("'a\\\n\\'\\\n\\'\nc"), (Texts{"'a\\", "\\", "'\\", "\\", "'", "c"}));
}

// ---- formatted strings ----

TEST(FormattedStrings, FieldsMayHoldAnythingFrom312On) {
  for (const char* text : {R"(f"{x["a"]}")", R"(f'{f'{f'{1}'}'}')", R"(f"{a["b"]:>{w["c"]}}")", "f'{a\n}'",
                           "f'{a # it's\n}'", R"(f"{'"'}")", R"(f"""{"""x"""}""")", R"(f"{x!r:^{y}}")",
                           R"(f"{x:{y:{z}}}")", R"(f"{(lambda x: "1")(2)}")", R"(f"\N{DASH}")", R"(f"{x:\N{DASH}}")",
                           R"(rf"\{x["a"]}")", R"(f"{d[":"]}")", R"(f"{x != "y"}")", R"(f"{rb"x\"y"}")"}) {
    ExpectOne(text, tok::STRING);
  }
}

TEST(FormattedStrings, DoubledBracesAreText) {
  EXPECT_EQ(TextsOf(R"(f"{{"a"}}")"), (Texts{R"(f"{{")", "a", R"("}}")"}));
}

TEST(FormattedStrings, EndAtTheirQuoteBefore312) {
  EXPECT_EQ(TextsOf(R"(f"{x["a"]}")", Version::Of(3, 11)), (Texts{R"(f"{x[")", "a", R"("]}")"}));
  EXPECT_EQ(TextsOf(R"(f"{x['a']}" y)", Version::Of(3, 11)), (Texts{R"(f"{x['a']}")", "y"}));
}

TEST(FormattedStrings, ABrokenFieldSpoilsOnlyItsLine) {
  EXPECT_EQ(TextsOf("x = f'{a'\nimport b\n"), (Texts{"x", "=", "f'{a'", "import", "b"}));
  EXPECT_EQ(TextsOf("x = f'{a\nimport b\n"), (Texts{"x", "=", "f'{a", "import", "b"}));
  EXPECT_EQ(TextsOf("f'{x:y'\nz"), (Texts{"f'{x:y'", "z"}));
  for (const char* text : {"f'a\\", "f'{a}\\", "f'''a\\", "f'{a:\\", "f'a\\N"}) EXPECT_EQ(TextsOf(text), Texts{text});
}

TEST(FormattedStrings, TooDeepANestingIsReadTheOldWay) {
  std::string deep;
  for (int i = 0; i < 200; ++i) deep += "f'{";
  for (int i = 0; i < 200; ++i) deep += "}'";
  EXPECT_EQ(TextsOf(deep)[0], "f'{f'");
  std::string shallow;
  for (int i = 0; i < 100; ++i) shallow += "f'{";
  shallow += "1";
  for (int i = 0; i < 100; ++i) shallow += "}'";
  ExpectOne(shallow, tok::STRING);
}

// ---- lines, gaps, bytes that are none ----

TEST(Lines, AllLineEndsCount) {
  const Tokenized result = Tokenize("a\nb\r\nc\rd\n");
  EXPECT_EQ(result.texts, (Texts{"a", "b", "c", "d"}));
  EXPECT_EQ(result.source->line_starts, (std::vector<uint32_t>{0, 2, 5, 7, 9}));
  EXPECT_EQ(result.source->PositionOf(result.source->tokens[3].text), (Position{3, 0}));
}

TEST(Lines, StartsWithinStringsCount) {
  const Tokenized result = Tokenize("'''a\nb\r\nc''' d\ne");
  EXPECT_EQ(result.source->PositionOf(result.source->tokens[1].text), (Position{2, 5}));
  EXPECT_EQ(result.source->PositionOf(result.source->tokens[2].text), (Position{3, 0}));
}

TEST(Lines, AByteOrderMarkIsNoPartOfTheFirstLine) {
  const Tokenized result = Tokenize("\xEF\xBB\xBFx = 1");
  EXPECT_EQ(result.texts, (Texts{"x", "=", "1"}));
  EXPECT_EQ(result.source->PositionOf(result.source->tokens[1].text), (Position{0, 2}));
}

TEST(Lines, TabsAndFormFeedsAreBlanks) { EXPECT_EQ(TextsOf("\f\tx\f=\t1"), (Texts{"x", "=", "1"})); }

TEST(Lines, ABackslashIsATokenByItself) {
  const Tokenized result = Tokenize("a \\\n b \\ c \\");
  EXPECT_EQ(result.texts, (Texts{"a", "\\", "b", "\\", "c", "\\"}));
  EXPECT_EQ(result.codes[1], tok::BACKSLASH);
  EXPECT_EQ(result.codes[5], tok::BACKSLASH);
}

TEST(Stray, CharactersAreErrorTokensOneByOne) {
  const Tokenized result = Tokenize(Text("$ ? ! \0 \x01\v", 10));
  EXPECT_EQ(result.texts, (Texts{"$", "?", "!", std::string(1, '\0'), "\x01", "\v"}));
  for (const int code : result.codes) EXPECT_EQ(code, tok::ERRORTOKEN);
}

TEST(Stray, NothingAtAllHasNoTokens) {
  for (const char* text : {"", "\n", "  ", "\xEF\xBB\xBF", "\r\n\r\n"}) EXPECT_TRUE(TextsOf(text).empty());
}

// ---- texts by themselves ----

TEST(CodeOfText, IsTotal) {
  EXPECT_EQ(CodeOfText(""), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("a b"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("a+"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("'a' 'b'"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("'a"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("'''a''"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("fu'a'"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("xy'a'"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("1x"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("++"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("**=="), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText(" "), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("\xFF"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText(Text("\0", 1)), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText(Text("a\0", 2)), tok::ERRORTOKEN);
}

TEST(CodeOfText, LineEndsCommentsAndBackslashesGoByTheirFirstCharacter) {
  EXPECT_EQ(CodeOfText("\n"), tok::NEWLINE);
  EXPECT_EQ(CodeOfText("\r\n"), tok::NEWLINE);
  EXPECT_EQ(CodeOfText("\n\n"), tok::ERRORTOKEN);
  EXPECT_EQ(CodeOfText("# type: int"), tok::COMMENT);
  EXPECT_EQ(CodeOfText("\\"), tok::BACKSLASH);
  EXPECT_EQ(CodeOfText("\\ x"), tok::BACKSLASH);
}

TEST(CodeOfText, TakesStringsOfAnyLength) {
  EXPECT_EQ(CodeOfText("'" + std::string(100000, 'x') + "'"), tok::STRING);
  EXPECT_EQ(CodeOfText(R"(f"{x["a"]}")"), tok::STRING);
}

// ---- hostile input ----

// A search to the end of everything for each of a hundred thousand openings would not end in the
// time a test run has.
TEST(Hostile, ManyUnclosedStringsTakeLinearTime) {
  for (const char* piece : {"f'{(\n", "f'{", "f'{f\"{", "'''a\n\"\"\"b\n", "'\\\n\\'\\\n", "'\"\\\n", "f\"\"\"{\n",
                            "f'{\"\\\n", "f'{\"\"\"\n", "x = f'{y\n"}) {
    std::string text;
    for (int i = 0; i < 100000; ++i) text += piece;
    EXPECT_FALSE(TextsOf(text).empty());
  }
}

}  // namespace
}  // namespace quillet
