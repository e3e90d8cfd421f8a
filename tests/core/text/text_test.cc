// The text of nodes in every mode.
#include <gtest/gtest.h>

#include "tests/core/support/analysis_helper.h"
#include "text/node_to_text.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {
namespace {

using testing::kPy2;
using testing::kPy3;
using testing::ParsedLine;

constexpr TextOptions kDotted{.dotted_name_only = true};
constexpr TextOptions kLiteral{.literal_only = true};
constexpr TextOptions kKeepParens{.discard_simple_parens = false};
constexpr TextOptions kAddParens{.add_parens_if_operator = true};

// "<none>" for none.
std::string TextOf(CNodeToTextConverter& converter, Text source, TextOptions options = {}, Version version = kPy3) {
  const ParsedLine line(source, version);
  const Text text = converter.TextForNode(line.root(), options);
  return IsNone(text) ? "<none>" : std::string(text);
}

std::string Plain(Text source, TextOptions options = {}, Version version = kPy3) {
  CNodeToTextConverter converter;
  return TextOf(converter, source, options, version);
}

// With bracket text, string contents and argument text.
std::string Full(Text source, TextOptions options = {}, Version version = kPy3) {
  CNodeToTextConverter converter(true, true, true);
  return TextOf(converter, source, options, version);
}

TEST(DottedNames, AChainOfAttributesIsItsSource) { EXPECT_EQ(Plain("a.b.c", kDotted), "a.b.c"); }

TEST(DottedNames, CallsSubscriptsAndNumbersHaveNone) {
  for (const Text source : {"a.b()", "a[0]", "1", "'s'", "a + b", "[a]", "(a, b)", "not a", "()", "[a].b", "(a, b).c",
                            "(a + b).c", "{a: b}.c.d", "(lambda: a).b", "'s'.a", "f().a"}) {
    EXPECT_EQ(Plain(source, kDotted), "<none>") << source;
    EXPECT_EQ(Full(source, kDotted), "<none>") << source;
  }
}

TEST(DottedNames, NameWordsHaveTheirTextWhereTheyAreNames) {
  EXPECT_EQ(Plain("None", kDotted, kPy2), "None");
  EXPECT_EQ(Plain("True", kDotted, kPy2), "True");
}

TEST(DottedNames, BlanksAndCommentsBetweenLinksAreLeftOut) {
  EXPECT_EQ(Plain("(a .\n  b # there\n .c)", kDotted), "a.b.c");
}

TEST(Parentheses, AroundOneExpressionAreDropped) {
  EXPECT_EQ(Plain("(a)"), "a");
  EXPECT_EQ(Plain("((a.b))"), "a.b");
  EXPECT_EQ(Plain("((a))", kDotted), "a");
}

TEST(Parentheses, StayWhereAskedAndThenNeedBracketText) {
  EXPECT_EQ(Plain("(a)", kKeepParens), "<none>");
  EXPECT_EQ(Full("(a)", kKeepParens), "(a)");
}

TEST(Parentheses, StayInFrontOfATrailer) {
  EXPECT_EQ(Full("(a).b"), "(a).b");
  EXPECT_EQ(Plain("(a).b"), "<none>");
}

TEST(Parentheses, InsideACompoundStay) { EXPECT_EQ(Full("(a) + b"), "(a) + b"); }

TEST(Brackets, AreEmptiedWithoutBracketText) {
  EXPECT_EQ(Plain("[1, 2]"), "[]");
  EXPECT_EQ(Plain("{}"), "{}");
  EXPECT_EQ(Plain("{1, 2}"), "{}");
  EXPECT_EQ(Plain("{1: 2}"), "{}");
  EXPECT_EQ(Plain("[]"), "[]");
}

TEST(Brackets, KeepTheirContentsWithBracketText) {
  EXPECT_EQ(Full("[1,2]"), "[1, 2]");
  EXPECT_EQ(Full("[1, 2]"), "[1, 2]");
  EXPECT_EQ(Full("{ 1 : 2 }"), "{1: 2}");
}

TEST(Brackets, OfTheEmptyTuple) {
  EXPECT_EQ(Plain("()"), "<none>");
  EXPECT_EQ(Full("()"), "( )");
  EXPECT_EQ(Full("( )"), "( )");
}

TEST(Strings, SideBySideShowTheFirst) {
  EXPECT_EQ(Full("\"a\" \"b\""), "\"a\"");
  EXPECT_EQ(Plain("\"a\" \"b\""), "''");
}

TEST(Strings, KeepHarmlessContentsOnly) {
  EXPECT_EQ(Full("'a.b'"), "'a.b'");
  EXPECT_EQ(Full("'a b,_9'"), "'a b,_9'");
  EXPECT_EQ(Full("'a-b'"), "''");
  EXPECT_EQ(Full("b'a-b'"), "b''");
  EXPECT_EQ(Full("u'a-b'"), "u''");
  EXPECT_EQ(Full("'a\\n'"), "''");
  EXPECT_EQ(Full("'''a\nb'''"), "''");
}

TEST(Strings, NonAsciiLettersAreHarmlessAndMalformedBytesAreNot) {
  EXPECT_EQ(Full("'\xC3\xA9'"), "'\xC3\xA9'");
  EXPECT_EQ(Full("'\xFF'"), "''");
}

TEST(Strings, WithoutContentsShowOnlyUnicode) {
  EXPECT_EQ(Plain("'a'"), "''");
  EXPECT_EQ(Plain("u'a'"), "u''");
  EXPECT_EQ(Plain("b'a'"), "''");
}

TEST(Strings, HarmlessOnesAreEncodedAsTheyStand) {
  for (const Text source : {"'a.b'", "\"it's, _9\"", "rb'x y'", "'\xC3\xA9'"}) {
    std::string encoded;
    AppendEncodedStringLiteral(source, encoded);
    EXPECT_EQ(Full(source), encoded);
  }
}

TEST(Literals, NamesAreNoneButTheThreeWords) {
  EXPECT_EQ(Plain("x", kLiteral), "<none>");
  for (const Version version : {kPy2, kPy3}) {
    for (const Text word : {"None", "True", "False"}) EXPECT_EQ(Plain(word, kLiteral, version), word);
  }
}

TEST(Literals, AttributesAreNone) {
  EXPECT_EQ(Plain("x.y", kLiteral), "<none>");
  EXPECT_EQ(Plain("None.y", kLiteral), "<none>");
  EXPECT_EQ(Plain("None.y"), "None.y");
}

TEST(Literals, OneNameSpoilsAList) {
  EXPECT_EQ(Full("[1, 'a', None]", kLiteral), "[1, 'a', None]");
  EXPECT_EQ(Full("[1, a]", kLiteral), "<none>");
}

TEST(Literals, InsideCallBracketsTheFlagMeansDottedNames) {
  // The callee itself must be a literal; None is one.
  EXPECT_EQ(Full("None(a.b)", kLiteral), "None(a.b)");
  EXPECT_EQ(Full("None(1)", kLiteral), "None()");
}

TEST(Operators, GetParenthesesOnRequestAndNeedBracketText) {
  EXPECT_EQ(Full("a+b", kAddParens), "(a + b)");
  EXPECT_EQ(Plain("a+b", kAddParens), "<none>");
  EXPECT_EQ(Full("a+b"), "a + b");
  EXPECT_EQ(Full("-x", kAddParens), "(-x)");
}

TEST(Operators, RequestedParenthesesAreForCompoundsAlone) {
  EXPECT_EQ(Full("a", kAddParens), "a");
  EXPECT_EQ(Full("a.b", kAddParens), "a.b");
  EXPECT_EQ(Full("'s'", kAddParens), "'s'");
}

TEST(Operators, APowerHasItsExponentWhereThatIsAskedFor) {
  CNodeToTextConverter converter(true, true, true);
  converter.set_shows_exponents(true);
  EXPECT_EQ(TextOf(converter, "a.b[c] ** -2"), "a.b[c] ** -2");
  EXPECT_EQ(TextOf(converter, "a ** 2", kAddParens), "(a ** 2)");
  EXPECT_EQ(TextOf(converter, "a ** b ** c", kAddParens), "(a ** b ** c)");
  EXPECT_EQ(TextOf(converter, "a ** 2", kDotted), "<none>");
}

TEST(Trailers, ShowBracketsAsTheOptionsSay) {
  EXPECT_EQ(Plain("f(x)"), "f()");
  EXPECT_EQ(Plain("x[0]"), "x[]");
  EXPECT_EQ(Full("a.b(c)[d]"), "a.b(c)[d]");
  EXPECT_EQ(Full("f( a,b )"), "f(a, b)");
}

TEST(Trailers, DropArgumentsWithoutAText) {
  CNodeToTextConverter converter(/*include_bracket_text=*/false, /*include_string_contents=*/false,
                                 /*include_arg_text=*/true);
  EXPECT_EQ(TextOf(converter, "a(b + c)"), "a()");
  EXPECT_EQ(TextOf(converter, "a(b)(c + d).e"), "a(b)().e");
  EXPECT_EQ(TextOf(converter, "a((b))"), "a(b)");
}

TEST(Trailers, OfAPowerHaveNoExponent) {
  EXPECT_EQ(Full("a.b ** 2"), "a.b");
  EXPECT_EQ(Full("a.b ** 2", {}, kPy2), "a.b");
}

TEST(Trailers, AwaitPlaysNoPart) {
  const ParsedLine line("async def f(a=await x.y): pass");
  auto* awaited = line.Find<CAtomExpr>();
  ASSERT_NE(awaited, nullptr);
  CNodeToTextConverter converter;
  EXPECT_EQ(converter.TextForNode(awaited), "x.y");
}

TEST(Trailers, OfAnUnknownKindAreAValueError) {
  const ParsedLine line("a.b");
  auto* chain = line.Find<CAtomExpr>();
  ASSERT_NE(chain, nullptr);
  CNode* dot = line.Find<CTrailer>()->children[0];
  dot->code = tok::COMMA;
  dot->text = ",";
  CNodeToTextConverter converter;
  try {
    converter.TextForNode(chain);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kValueError);
    EXPECT_EQ(error.message(), "Bad trailer node");
  }
}

TEST(Failures, NoNodeIsAnAttributeError) {
  CNodeToTextConverter converter;
  try {
    converter.TextForNode(nullptr);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kAttributeError);
  }
}

TEST(Failures, ACompoundOfNothingIsATypeError) {
  const ParsedLine line("a + b");
  auto* sum = line.Find<COperatorExpression>();
  ASSERT_NE(sum, nullptr);
  CNode* childless = sum->pool->Construct(sum->kind, sum->fClsInfo);
  CNodeToTextConverter converter(true, true, true);
  try {
    converter.TextForNode(childless);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kTypeError);
    EXPECT_EQ(error.message(), "'NoneType' object is not subscriptable");
  }
}

TEST(Failures, NestingPastTheBoundIsARecursionErrorAndSpoilsNothing) {
  const auto nested = [](int depth) { return std::string(depth, '[') + "1" + std::string(depth, ']'); };
  const int depth = CNodeToTextConverter::kMaxDepth;
  CNodeToTextConverter converter(true, true, true);
  EXPECT_EQ(TextOf(converter, nested(depth)), nested(depth));
  try {
    TextOf(converter, nested(depth + 1));
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kRecursionError);
    EXPECT_EQ(error.message(), "maximum recursion depth exceeded while rendering a node");
  }
  EXPECT_EQ(TextOf(converter, "[a]"), "[a]");
}

TEST(Views, TokensSideBySideAreTakenFromTheSource) {
  CNodeToTextConverter converter(true, true, true);
  for (const Text source : {"a.b.c", "f(x, 1)", "x[0].y", "a + b", "[1, 'a']", "f(g(a), [b])"}) {
    const ParsedLine line(source);
    const Text text = converter.TextForNode(line.root());
    EXPECT_EQ(text, source);
    EXPECT_TRUE(line.line().source->Holds(text.data())) << source;
  }
}

TEST(Views, OtherTextsAreComposed) {
  EXPECT_EQ(Full("a . b ( c ) [ d ]"), "a.b(c)[d]");
  EXPECT_EQ(Full("f(a,b).g( 'x-y' ).h"), "f(a, b).g('').h");
  EXPECT_EQ(Full("[f(a,b),[c ,d]]"), "[f(a, b), [c, d]]");
}

}  // namespace
}  // namespace quillet
