// Non-nested scanning, the tokenizer over a string, and the helpers beside them.
#include <gtest/gtest.h>

#include <chrono>
#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "foundations/errors.h"
#include "foundations/strutils.h"
#include "tokens/bits.h"
#include "tokens/clock.h"
#include "tokens/nonnested.h"
#include "tokens/string_tokenizer.h"

namespace quillet {
namespace {

// All matches in the order found.
std::vector<int64_t> Find(Text text, Text pattern, int64_t start = 0, int64_t end = -1) {
  tNonNestedStruct search;
  InitNonNestedStruct(search, text, pattern, start, end < 0 ? static_cast<int64_t>(text.size()) : end);
  std::vector<int64_t> found;
  for (int64_t at; (at = FindNextNonNestedStruct(search)) >= 0;) found.push_back(at);
  return found;
}

using Offsets = std::vector<int64_t>;

template <class Call>
ErrorKind KindOfError(Call call) {
  try {
    call();
  } catch (const Error& error) {
    return error.kind();
  }
  ADD_FAILURE() << "no error was thrown";
  return ErrorKind::kRuntimeError;
}

// ---- searching ----

TEST(FindNextNonNested, FindsCommasOutsideBrackets) { EXPECT_EQ(Find("a, (b, c), d", ","), (Offsets{1, 9})); }

TEST(FindNextNonNested, PassesOverStrings) {
  EXPECT_EQ(Find("'a,b', \"c,d\", e", ","), (Offsets{5, 12}));
  EXPECT_EQ(Find("'''a',b''', c", ","), (Offsets{10}));
  EXPECT_EQ(Find("'it\\'s, so', c", ","), (Offsets{11}));
  EXPECT_EQ(Find("'', c", ","), (Offsets{2}));
}

TEST(FindNextNonNested, FindsNothingForAnEmptyPatternOrInNoText) {
  EXPECT_EQ(Find("a, b", ""), Offsets{});
  EXPECT_EQ(Find("", ","), Offsets{});
  EXPECT_EQ(Find(",", ",", 0, 0), Offsets{});
}

TEST(FindNextNonNested, FindsNoPatternThatTheEndCutsOff) {
  EXPECT_EQ(Find("a -", "->"), Offsets{});
  EXPECT_EQ(Find("a ->", "->", 0, 3), Offsets{});
  EXPECT_EQ(Find("a ->", "->"), (Offsets{2}));
}

TEST(FindNextNonNested, FindsNothingBehindAnUnbalancedClosingBracket) {
  EXPECT_EQ(Find("a), b, c", ","), Offsets{});
  EXPECT_EQ(Find("a), b, (c, d", ","), (Offsets{9})) << "an opening bracket brings the depth back to 0";
}

TEST(FindNextNonNested, DoesNotTellKindsOfBracketsApart) { EXPECT_EQ(Find("(a, b], c", ","), (Offsets{6})); }

TEST(FindNextNonNested, FindsBracketsThemselves) {
  EXPECT_EQ(Find("f(x)", "("), (Offsets{1}));
  EXPECT_EQ(Find("x) y", ")"), (Offsets{1}));
}

TEST(FindNextNonNested, MatchesDoNotOverlap) { EXPECT_EQ(Find("aaaa", "aa"), (Offsets{0, 2})); }

TEST(FindNextNonNested, StartsAndStopsWhereItIsTold) {
  EXPECT_EQ(Find("a,b,c,d", ",", 2), (Offsets{3, 5}));
  EXPECT_EQ(Find("a,b,c,d", ",", 2, 5), (Offsets{3}));
  EXPECT_EQ(Find("a,b", ",", 3, 3), Offsets{});
}

TEST(FindNextNonNested, StaysAtItsEnd) {
  tNonNestedStruct search;
  InitNonNestedStruct(search, "a, b", ",", 0, 4);
  EXPECT_EQ(FindNextNonNestedStruct(search), 1);
  EXPECT_EQ(FindNextNonNestedStruct(search), -1);
  EXPECT_EQ(FindNextNonNestedStruct(search), -1);
}

TEST(FindNextNonNested, TakesAnUnclosedStringToTheEnd) { EXPECT_EQ(Find("a, 'b, c", ","), (Offsets{1})); }

TEST(FindNextNonNested, IsLinearWhereEveryQuoteIsEscaped) {
  std::string text;
  for (int i = 0; i < 1000000; ++i) text += "\\'";
  EXPECT_EQ(Find("'" + text + ",", ","), Offsets{});
}

TEST(InitNonNestedStruct, RejectsBoundsOutsideTheText) {
  tNonNestedStruct search;
  for (const auto& [start, end] : std::vector<std::pair<int64_t, int64_t>>{{-1, 2}, {0, 4}, {4, 3}, {0, -1}}) {
    EXPECT_EQ(KindOfError([&, s = start, e = end] { InitNonNestedStruct(search, "abc", "b", s, e); }),
              ErrorKind::kAssertionError);
  }
  EXPECT_NO_THROW(InitNonNestedStruct(search, "abc", "b", 3, 3));
}

TEST(InitNonNestedStruct, CountsTheTextUpToItsFirstNul) {
  tNonNestedStruct search;
  EXPECT_EQ(KindOfError([&] { InitNonNestedStruct(search, Text("ab\0cd", 5), "c", 0, 5); }),
            ErrorKind::kAssertionError);
}

// ---- strings and items ----

TEST(FindStringEndNonNested, EndsBehindTheClosingQuote) {
  const auto end_of = [](Text text) {
    return FindStringEndNonNested(text.data(), 0, static_cast<int64_t>(text.size()));
  };
  EXPECT_EQ(end_of("'a' b"), 3);
  EXPECT_EQ(end_of("\"a'b\" c"), 5);
  EXPECT_EQ(end_of("'''a''b''' c"), 10);
  EXPECT_EQ(end_of("''"), 2);
  EXPECT_EQ(end_of("'a\\'b'"), 6);
  EXPECT_EQ(end_of("'''a\\'''b'''"), 12);
}

TEST(FindStringEndNonNested, EndsAtTheEndForAnUnclosedString) {
  const auto end_of = [](Text text) {
    return FindStringEndNonNested(text.data(), 0, static_cast<int64_t>(text.size()));
  };
  EXPECT_EQ(end_of("'abc"), 4);
  EXPECT_EQ(end_of("'''abc''"), 8);
  EXPECT_EQ(end_of("'abc\\"), 5);
  EXPECT_EQ(end_of("'"), 1);
  EXPECT_EQ(FindStringEndNonNested("'abc'", 0, 3), 3) << "the closing quote must lie within the end";
}

TEST(FindStringEndNonNested, RejectsAPlaceWithoutAQuote) {
  EXPECT_EQ(KindOfError([] { FindStringEndNonNested("abc", 1, 3); }), ErrorKind::kValueError);
  EXPECT_EQ(KindOfError([] { FindStringEndNonNested("'a'", 3, 3); }), ErrorKind::kValueError);
  EXPECT_EQ(KindOfError([] { FindStringEndNonNested("'a'", -1, 3); }), ErrorKind::kValueError);
}

TEST(NextNonNestedUtf8PtrIndex, StepsOverBytesGroupsAndStrings) {
  const Text text = "a(b, [c], ')')d'e'";
  const auto size = static_cast<int64_t>(text.size());
  EXPECT_EQ(NextNonNestedUtf8PtrIndex(text.data(), 0, size), 1);
  EXPECT_EQ(NextNonNestedUtf8PtrIndex(text.data(), 1, size), 14);
  EXPECT_EQ(NextNonNestedUtf8PtrIndex(text.data(), 14, size), 15);
  EXPECT_EQ(NextNonNestedUtf8PtrIndex(text.data(), 15, size), 18);
  EXPECT_EQ(NextNonNestedUtf8PtrIndex(text.data(), 18, size), -1);
}

TEST(NextNonNestedUtf8PtrIndex, TakesAClosingBracketForAPlainByte) {
  EXPECT_EQ(NextNonNestedUtf8PtrIndex(")a", 0, 2), 1);
  EXPECT_EQ(NonInlineNextNonNestedUtf8PtrIndex(")a", 0, 2), 1);
}

TEST(NextNonNestedUtf8PtrIndex, EndsAtTheEndForAnUnclosedGroup) {
  EXPECT_EQ(NextNonNestedUtf8PtrIndex("(a", 0, 2), 2);
  EXPECT_EQ(NextNonNestedUtf8PtrIndex("([)", 0, 3), 3);
  EXPECT_EQ(NextNonNestedUtf8PtrIndex("(a)", 0, 2), 2);
}

// ---- tokenizer ----

struct Seen {
  std::string token;
  int64_t offset;
  int64_t depth;
  friend bool operator==(const Seen&, const Seen&) = default;
};
std::ostream& operator<<(std::ostream& out, const Seen& seen) {
  return out << seen.token << '@' << seen.offset << '/' << seen.depth;
}

std::vector<Seen> TokensOf(Text text) {
  std::vector<Seen> seen;
  for (CStringTokenizer tokenizer(text); !tokenizer.AtEnd(); tokenizer.Advance()) {
    seen.push_back({std::string(tokenizer.Current()), tokenizer.Offset(), tokenizer.BracketDepth()});
  }
  return seen;
}

TEST(StringTokenizer, GivesTokensOffsetsAndTheDepthInFrontOfEach) {
  EXPECT_EQ(TokensOf("(a, [b]) -> c"), (std::vector<Seen>{{"(", 0, 0},
                                                          {"a", 1, 1},
                                                          {",", 2, 1},
                                                          {"[", 4, 1},
                                                          {"b", 5, 2},
                                                          {"]", 6, 2},
                                                          {")", 7, 1},
                                                          {"->", 9, 0},
                                                          {"c", 12, 0}}));
}

TEST(StringTokenizer, CountsOffsetsInBytes) {
  EXPECT_EQ(TokensOf("\xC3\xA9 x"), (std::vector<Seen>{{"\xC3\xA9", 0, 0}, {"x", 3, 0}}));
}

TEST(StringTokenizer, GoesOnBehindLineEndsAndErrors) {
  EXPECT_EQ(TokensOf("a\n  $ 'b\nc"), (std::vector<Seen>{{"a", 0, 0}, {"$", 4, 0}, {"'b", 6, 0}, {"c", 9, 0}}));
}

TEST(StringTokenizer, IgnoresClosingBracketsWithoutAnOpenOne) {
  EXPECT_EQ(TokensOf(") ( a"), (std::vector<Seen>{{")", 0, 0}, {"(", 2, 0}, {"a", 4, 1}}));
}

TEST(StringTokenizer, StaysAtItsEnd) {
  CStringTokenizer tokenizer("ab");
  EXPECT_FALSE(tokenizer.AtEnd());
  tokenizer.Advance();
  for (int i = 0; i < 2; ++i) {
    EXPECT_TRUE(tokenizer.AtEnd());
    EXPECT_TRUE(IsNone(tokenizer.Current()));
    EXPECT_EQ(tokenizer.CurrentCode(), tok::ENDMARKER);
    EXPECT_EQ(tokenizer.Offset(), 2);
    tokenizer.Advance();
  }
}

TEST(StringTokenizer, IsAtItsEndAtOnceForATextWithoutTokens) {
  for (const Text text : {"", "  ", "\n\n"}) EXPECT_TRUE(CStringTokenizer(text).AtEnd());
}

// ---- clock ----

double FixedTime() { return 100.0; }

TEST(Clock, CountsTheMomentItselfAsOutOfTime) {
  SetTimeFunc(FixedTime);
  EXPECT_EQ(GetNowTime(), 100.0);
  EXPECT_TRUE(OutOfTime(100.0));
  EXPECT_TRUE(OutOfTime(99.5));
  EXPECT_FALSE(OutOfTime(100.5));
  SetTimeFunc(nullptr);
}

TEST(Clock, IsThePresentUnlessReplaced) {
  const double before = std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  EXPECT_GE(GetNowTime(), before);
  EXPECT_TRUE(OutOfTime(0.0));
  EXPECT_FALSE(OutOfTime(before + 1e9));
}

TEST(Clock, PassesOnWhatTheClockThrows) {
  SetTimeFunc([]() -> double { ThrowError(ErrorKind::kRuntimeError, "no time"); });
  EXPECT_EQ(KindOfError([] { OutOfTime(0.0); }), ErrorKind::kRuntimeError);
  SetTimeFunc(nullptr);
}

// ---- bits, bytes, joining ----

TEST(Bits, GoThroughUnchanged) {
  EXPECT_EQ(ULongLongValueForDoubleBits(1.0), 0x3FF0000000000000u);
  EXPECT_EQ(DoubleValueForULongLongBits(0x3FF0000000000000u), 1.0);
  const uint64_t nan_with_payload = 0x7FF800000000ABCDu;
  EXPECT_TRUE(std::isnan(DoubleValueForULongLongBits(nan_with_payload)));
  EXPECT_EQ(ULongLongValueForDoubleBits(DoubleValueForULongLongBits(nan_with_payload)), nan_with_payload);
  EXPECT_EQ(ULongLongValueForDoubleBits(-0.0), uint64_t{1} << 63);
}

TEST(StrInStr, EndsAtTheFirstNulOfEither) {
  EXPECT_TRUE(StrInStr("b", "abc"));
  EXPECT_TRUE(StrInStr("", "abc"));
  EXPECT_TRUE(StrInStr("", ""));
  EXPECT_FALSE(StrInStr("c", Text("ab\0c", 4)));
  EXPECT_TRUE(StrInStr(Text("b\0x", 3), "abc"));
  EXPECT_FALSE(StrInStr("abcd", "abc"));
}

TEST(ByteClasses, AreThoseOfAscii) {
  EXPECT_TRUE(IsDigit('5'));
  EXPECT_FALSE(IsDigit('a'));
  EXPECT_TRUE(IsAlnum('a'));
  EXPECT_TRUE(IsAlnum('0'));
  EXPECT_FALSE(IsAlnum('_'));
  for (const int64_t c : {int64_t{255}, int64_t{256 + '5'}, int64_t{-1}, std::numeric_limits<int64_t>::max()}) {
    EXPECT_FALSE(IsDigit(c));
    EXPECT_FALSE(IsAlnum(c));
  }
}

TEST(Utf8Concat5, LeavesAbsentPiecesOut) {
  EXPECT_EQ(Utf8Concat5("a", kNoText, "b", "", "c"), "abc");
  EXPECT_EQ(Utf8Concat5("a", "b"), "ab");
  EXPECT_EQ(Utf8Concat5(kNoText, kNoText), "");
}

TEST(BytesForInteger, WritesDecimalDigits) {
  EXPECT_EQ(BytesForInteger(0), "0");
  EXPECT_EQ(BytesForInteger(-12), "-12");
  EXPECT_EQ(BytesForInteger(std::numeric_limits<int64_t>::min()), "-9223372036854775808");
}

TEST(Utf8Len, CountsBytes) { EXPECT_EQ(Utf8Len("a\xC3\xA9"), 3); }

TEST(TextPosInfo, KnowsNoColumnUntilGivenOne) {
  const TextPosInfo info;
  EXPECT_EQ(info, (TextPosInfo{0, -1, -1}));
  EXPECT_EQ((TextPosInfo{0, -1, 7}).utf8_col, 7);
}

}  // namespace
}  // namespace quillet
