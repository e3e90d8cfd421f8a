// UTF-8 primitives, character tables, errors and the text arena.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <thread>
#include <unordered_map>
#include <vector>

#include "foundations/arena.h"
#include "foundations/char_tables.h"
#include "foundations/console.h"
#include "foundations/errors.h"
#include "foundations/number_map.h"
#include "foundations/ref.h"
#include "foundations/utf8.h"

namespace quillet {
namespace {

// Runs `call` and gives the error it throws.
template <class Call>
Error ErrorOf(Call call) {
  try {
    call();
  } catch (const Error& error) {
    return error;
  }
  ADD_FAILURE() << "no error was thrown";
  return Error(ErrorKind::kRuntimeError, "");
}

DecodedChar Decode(Text text) { return DecodeUtf8(text.data(), text.data() + text.size()); }

// ---- decoding ----

TEST(DecodeUtf8, ReadsEveryCodePointBackFromItsBytes) {
  for (uint32_t code_point = 0; code_point < kCodePointLimit; ++code_point) {
    if (code_point >= 0xD800 && code_point < 0xE000) continue;
    std::string bytes;
    AppendUtf8(code_point, bytes);
    const DecodedChar decoded = Decode(bytes);
    ASSERT_EQ(decoded.code_point, code_point);
    ASSERT_EQ(decoded.length, bytes.size());
  }
}

TEST(DecodeUtf8, RejectsSurrogates) {
  for (uint32_t code_point = 0xD800; code_point < 0xE000; ++code_point) {
    std::string bytes;
    AppendUtf8(code_point, bytes);
    ASSERT_EQ(Decode(bytes).length, 0u);
  }
}

TEST(DecodeUtf8, RejectsOverlongForms) {
  for (const Text bytes :
       {"\xC0\x80", "\xC1\xBF", "\xE0\x80\x80", "\xE0\x9F\xBF", "\xF0\x80\x80\x80", "\xF0\x8F\xBF\xBF"}) {
    EXPECT_EQ(Decode(bytes).length, 0u) << bytes;
  }
}

TEST(DecodeUtf8, RejectsWhatLiesPastTheLastCodePoint) {
  for (const Text bytes : {"\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xF8\x88\x80\x80\x80", "\xFE", "\xFF"}) {
    EXPECT_EQ(Decode(bytes).length, 0u) << bytes;
  }
}

TEST(DecodeUtf8, RejectsCharactersThatTheEndCutsOff) {
  for (const Text whole : {"\xC3\xA9", "\xE2\x82\xAC", "\xF0\x9F\x98\x80"}) {
    for (size_t size = 0; size < whole.size(); ++size) EXPECT_EQ(Decode(whole.substr(0, size)).length, 0u);
    EXPECT_EQ(Decode(whole).length, whole.size());
  }
}

TEST(DecodeUtf8, RejectsLoneContinuationBytesAndBrokenOnes) {
  for (const Text bytes : {"\x80", "\xBF", "\xC3(", "\xE2\x82(", "\xE2(\xAC", "\xF0\x9F\x98(", "\xF0(\x98\x80"}) {
    EXPECT_EQ(Decode(bytes).length, 0u) << bytes;
  }
}

TEST(DecodeUtf8, TellsWhetherAWholeTextIsWellFormed) {
  EXPECT_TRUE(IsWellFormedUtf8(""));
  EXPECT_TRUE(IsWellFormedUtf8("a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80"));
  EXPECT_FALSE(IsWellFormedUtf8("a\xC3"));
  EXPECT_EQ(CharCountOfUtf8("a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80"), 4u);
}

// ---- characters by position ----

// "a", a two-byte letter, a blank.
constexpr Text kLetters = "a\xC3\xA9 ";
int64_t Adjust(int64_t pos, int64_t diff, int64_t end_pos = 4) {
  return AdjustUtf8Pos(kLetters.data(), pos, diff, end_pos);
}

TEST(Ucs4CharAtUtf8Pos, IsZeroAtOrPastTheEnd) {
  EXPECT_EQ(Ucs4CharAtUtf8Pos(kLetters.data(), 4, 4), 0u);
  EXPECT_EQ(Ucs4CharAtUtf8Pos(kLetters.data(), 9, 4), 0u);
  EXPECT_EQ(Ucs4CharAtUtf8Pos(kLetters.data(), 0, 0), 0u);
}

TEST(Ucs4CharAtUtf8Pos, ReadsAsciiAndLongerCharacters) {
  EXPECT_EQ(Ucs4CharAtUtf8Pos(kLetters.data(), 0, 4), uint32_t{'a'});
  EXPECT_EQ(Ucs4CharAtUtf8Pos(kLetters.data(), 1, 4), 0xE9u);
}

TEST(Ucs4CharAtUtf8Pos, FailsInsideACharacterAndWhereTheEndCutsItOff) {
  EXPECT_EQ(ErrorOf([] { Ucs4CharAtUtf8Pos(kLetters.data(), 2, 4); }).kind(), ErrorKind::kValueError);
  EXPECT_EQ(ErrorOf([] { Ucs4CharAtUtf8Pos(kLetters.data(), 1, 2); }).kind(), ErrorKind::kValueError);
}

TEST(AdjustUtf8Pos, StepsOverTheTwoByteLetter) { EXPECT_EQ(Adjust(0, 2), 3); }

TEST(AdjustUtf8Pos, MovesBackToTheStartOfTheCharacter) { EXPECT_EQ(Adjust(2, 0), 1); }

TEST(AdjustUtf8Pos, StopsAtTheEndGoingForward) {
  EXPECT_EQ(Adjust(0, 3), 4);
  EXPECT_EQ(Adjust(0, 100), 4);
  EXPECT_EQ(Adjust(4, 1), 4);
  EXPECT_EQ(Adjust(9, 1), 9);
}

TEST(AdjustUtf8Pos, DoesNotAlignAtOrPastTheEnd) {
  EXPECT_EQ(Adjust(2, 0, 2), 2);
  EXPECT_EQ(Adjust(4, 0), 4);
}

TEST(AdjustUtf8Pos, StepsBackward) {
  EXPECT_EQ(Adjust(3, -1), 1);
  EXPECT_EQ(Adjust(4, -1), 3);
  EXPECT_EQ(Adjust(4, -3), 0);
  EXPECT_EQ(Adjust(2, -1), 0);
}

TEST(AdjustUtf8Pos, CountsWhatStandsBehindTheEndGoingBackward) {
  EXPECT_EQ(AdjustUtf8Pos("abcdef", 5, -1, 3), 4);
  EXPECT_EQ(AdjustUtf8Pos("abcdef", 5, -4, 0), 1);
  EXPECT_EQ(Adjust(3, -1, 3), 1);
  EXPECT_EQ(Adjust(2, -1, 2), 1);
}

TEST(AdjustUtf8Pos, IsNegativeBackwardPastTheStart) {
  EXPECT_EQ(Adjust(0, -1), -1);
  EXPECT_EQ(Adjust(3, -100), -1);
  EXPECT_EQ(Adjust(-1, -1), -2);
}

TEST(AdjustUtf8Pos, TakesTheWidestNumbersWithoutReadingOutside) {
  EXPECT_EQ(Adjust(0, INT64_MIN), -1);
  EXPECT_EQ(Adjust(0, INT64_MAX), 4);
  EXPECT_EQ(Adjust(INT64_MIN, 1), 0);
  EXPECT_EQ(Adjust(INT64_MIN, -1), INT64_MIN);
}

TEST(AdjustUtf8Pos, ForwardAndBackwardAgreeOnEveryBoundary) {
  const std::string text = "x\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80y";
  const std::vector<int64_t> starts = {0, 1, 3, 6, 10};
  const auto end = static_cast<int64_t>(text.size());
  for (size_t from = 0; from < starts.size(); ++from) {
    for (size_t to = 0; to < starts.size(); ++to) {
      const int64_t diff = static_cast<int64_t>(to) - static_cast<int64_t>(from);
      EXPECT_EQ(AdjustUtf8Pos(text.data(), starts[from], diff, end), starts[to]) << from << " to " << to;
    }
  }
}

TEST(IsIdentifierCharAtUtf8Pos, TakesDigitsOnlyBehindTheFirstPlace) {
  EXPECT_FALSE(IsIdentifierCharAtUtf8Pos("1", 0, 1, true));
  EXPECT_TRUE(IsIdentifierCharAtUtf8Pos("1", 0, 1, false));
}

TEST(IsIdentifierCharAtUtf8Pos, TakesLettersAndUnderscoreAnywhere) {
  for (const Text text : {"a", "Z", "_"}) {
    EXPECT_TRUE(IsIdentifierCharAtUtf8Pos(text.data(), 0, 1, true));
    EXPECT_TRUE(IsIdentifierCharAtUtf8Pos(text.data(), 0, 1, false));
  }
  for (const Text text : {"-", " ", ".", "\x7f"}) EXPECT_FALSE(IsIdentifierCharAtUtf8Pos(text.data(), 0, 1, false));
  EXPECT_FALSE(IsIdentifierCharAtUtf8Pos("a", 1, 1, true));
}

TEST(ClassifiersAtUtf8Pos, FollowTheCLocaleForAscii) {
  for (int c = 0; c < 128; ++c) {
    const char byte = static_cast<char>(c);
    const bool digit = c >= '0' && c <= '9';
    const bool letter = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
    EXPECT_EQ(IsDigitAtUtf8Pos(&byte, 0, 1), digit) << c;
    EXPECT_EQ(IsAlnumAtUtf8Pos(&byte, 0, 1), digit || letter) << c;
    EXPECT_EQ(IsSpaceAtUtf8Pos(&byte, 0, 1), c == ' ' || (c >= 9 && c <= 13)) << c;
  }
}

TEST(ClassifiersAtUtf8Pos, AreFalseAtOrPastTheEnd) {
  EXPECT_FALSE(IsSpaceAtUtf8Pos(" ", 1, 1));
  EXPECT_FALSE(IsDigitAtUtf8Pos("1", 5, 1));
  EXPECT_FALSE(IsAlnumAtUtf8Pos("a", 0, 0));
}

TEST(ClassifiersAtUtf8Pos, FailOnMalformedBytes) {
  EXPECT_EQ(ErrorOf([] { IsSpaceAtUtf8Pos("\xFF", 0, 1); }).kind(), ErrorKind::kValueError);
  EXPECT_EQ(ErrorOf([] { IsIdentifierCharAtUtf8Pos("\xFF", 0, 1, true); }).kind(), ErrorKind::kValueError);
}

TEST(PtrFindByte, FindsFromTheStartOn) {
  EXPECT_EQ(PtrFindByte("abcabc", 6, 'b', 0), 1);
  EXPECT_EQ(PtrFindByte("abcabc", 6, 'b', 2), 4);
  EXPECT_EQ(PtrFindByte("abcabc", 6, 'x', 0), -1);
  EXPECT_EQ(PtrFindByte("abcabc", 3, 'c', 2), 2);
}

TEST(PtrFindByte, RejectsAStartOutsideTheBytes) {
  for (const int64_t start : {int64_t{6}, int64_t{7}, int64_t{-1}, INT64_MIN, INT64_MAX}) {
    const Error error = ErrorOf([start] { PtrFindByte("abcabc", 6, 'a', start); });
    EXPECT_EQ(error.kind(), ErrorKind::kValueError);
    EXPECT_EQ(error.message(), "Invalid start");
  }
  EXPECT_EQ(ErrorOf([] { PtrFindByte("", 0, 'a', 0); }).message(), "Invalid start");
}

// ---- character tables ----

TEST(CharTables, ClassifyAsciiAsPythonDoes) {
  EXPECT_EQ(CharClassOf('a') & kCharAlpha, kCharAlpha);
  EXPECT_EQ(CharClassOf('7') & kCharAlnum, kCharDecimal | kCharDigit | kCharNumeric);
  EXPECT_FALSE(CharClassOf('7') & kCharIdStart);
  EXPECT_TRUE(CharClassOf('7') & kCharIdContinue);
  EXPECT_TRUE(CharClassOf('_') & kCharIdStart);
  EXPECT_TRUE(CharClassOf(0x1c) & kCharSpace);
  EXPECT_FALSE(CharClassOf('\n') & kCharPrintable);
}

TEST(CharTables, TakeEverythingBeyondAsciiForLettersWithoutAHost) {
  for (const uint32_t code_point : {0x80u, 0xE9u, 0x20ACu, 0x1F600u, 0x10FFFFu}) {
    EXPECT_TRUE(CharClassOf(code_point) & kCharAlpha) << code_point;
    EXPECT_TRUE(CharClassOf(code_point) & kCharIdStart) << code_point;
  }
  EXPECT_EQ(CharClassOf(0x110000), 0);
  EXPECT_EQ(CharClassOf(UINT32_MAX), 0);
}

TEST(CharTables, AskALoaderOnceAPage) {
  static int calls;
  calls = 0;
  SetCharPageLoader([](uint32_t first, uint8_t* classes) {
    ++calls;
    for (uint32_t i = 0; i < kCharPageSize; ++i) classes[i] = first + i == 0x2003 ? kCharSpace : 0;
  });
  EXPECT_EQ(CharClassOf(0x2003), kCharSpace);
  EXPECT_EQ(CharClassOf(0x20AC), 0);
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(IsSpaceAtUtf8Pos("\xE2\x80\x83", 0, 3));
  EXPECT_FALSE(IsAlnumAtUtf8Pos("\xE2\x82\xAC", 0, 3));
  SetCharPageLoader(nullptr);
  EXPECT_TRUE(CharClassOf(0x20AC) & kCharAlpha);
}

TEST(CharTables, ServeThreadsThatMeetAPageAtOnce) {
  SetCharPageLoader(nullptr);  // drops the pages
  std::vector<std::thread> threads;
  std::atomic<int> wrong{0};
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&wrong] {
      for (uint32_t code_point = 0x80; code_point < 0x20000; code_point += 64) {
        if (!(CharClassOf(code_point) & kCharAlpha)) ++wrong;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(wrong, 0);
}

// ---- errors ----

TEST(Errors, CarryKindAndMessage) {
  const Error error = ErrorOf([] { ThrowError(ErrorKind::kIndexError, "string index out of range"); });
  EXPECT_EQ(error.kind(), ErrorKind::kIndexError);
  EXPECT_STREQ(error.what(), "string index out of range");
}

TEST(Errors, AssertThrowsOnlyWhereTheConditionFails) {
  EXPECT_NO_THROW(Assert(true, "no"));
  const Error error = ErrorOf([] { Assert(false, "yes"); });
  EXPECT_EQ(error.kind(), ErrorKind::kAssertionError);
  EXPECT_EQ(error.message(), "yes");
}

TEST(Errors, ReprReadsAsTheHostWritesIt) {
  const auto repr = [](auto error) { return ReprOfException(std::make_exception_ptr(error)); };
  EXPECT_EQ(repr(Error(ErrorKind::kRuntimeError, "too deep")), "RuntimeError('too deep')");
  EXPECT_EQ(repr(Error(ErrorKind::kGrammarError, "it's")), "ValueError(\"it's\")");
  EXPECT_EQ(repr(SyntaxError("invalid syntax", "<string>", 1, 2, "x\n")),
            "SyntaxError('invalid syntax', ('<string>', 1, 2, 'x\\n'))");
  EXPECT_EQ(repr(std::bad_alloc()), "MemoryError()");
  EXPECT_EQ(repr(std::runtime_error("odd")), "Exception('odd')");
  EXPECT_EQ(repr(1), "Exception()");
}

TEST(Errors, AreReportedOnALineWhereNoHostTakesThem) {
  ::testing::internal::CaptureStderr();
  TheConsole().report_exception(std::make_exception_ptr(Error(ErrorKind::kValueError, "odd")), false);
  EXPECT_EQ(::testing::internal::GetCapturedStderr(), "ValueError('odd')\n");
}

TEST(Errors, ReprOfTextChoosesQuotesAndEscapesAsTheHostDoes) {
  EXPECT_EQ(ReprOfText(""), "''");
  EXPECT_EQ(ReprOfText("it's"), "\"it's\"");
  EXPECT_EQ(ReprOfText("it's \"so\""), "'it\\'s \"so\"'");
  EXPECT_EQ(ReprOfText("a\\b\n\r\t\x01\x7f"), "'a\\\\b\\n\\r\\t\\x01\\x7f'");
  EXPECT_EQ(ReprOfText("\xC3\xA9\xC2\x85"), "'\xC3\xA9\\x85'");
  EXPECT_EQ(ReprOfText("\xFF"), "'\\xff'");
  SetCharPageLoader([](uint32_t, uint8_t* classes) { std::fill_n(classes, kCharPageSize, uint8_t{0}); });
  EXPECT_EQ(ReprOfText("\xC3\xBF\xC4\x80\xEF\xBF\xBF\xF0\x90\x80\x80"), "'\\xff\\u0100\\uffff\\U00010000'");
  SetCharPageLoader(nullptr);
}

TEST(Errors, EveryKindHasTheNameOfAHostException) {
  EXPECT_STREQ(HostExceptionName(ErrorKind::kTypeError), "TypeError");
  EXPECT_STREQ(HostExceptionName(ErrorKind::kRecursionError), "RecursionError");
  EXPECT_STREQ(HostExceptionName(ErrorKind::kGrammarError), "ValueError");
  EXPECT_STREQ(HostExceptionName(ErrorKind::kParseError), "ParseError");
}

TEST(Errors, AContextIsOneOfFourThings) {
  EXPECT_TRUE(Context::None().IsNone());
  EXPECT_TRUE(Context::Index(3).IsIndex());
  EXPECT_TRUE(Context::At({2, 5}).IsPosition());
  EXPECT_TRUE(Context::Foreign(7).IsForeign());
  EXPECT_EQ(Context::At({2, 5}).position(), (Position{2, 5}));
  EXPECT_NE(Context::Index(0), Context::None());
}

TEST(Console, AHostsMeansReplaceTheOwn) {
  static std::string printed;
  const Console saved = TheConsole();
  TheConsole().print_line = [](Text line) { printed = line; };
  PrintLine("one line");
  TheConsole() = saved;
  EXPECT_EQ(printed, "one line");
}

// ---- arena ----

TEST(TextArena, KeepsEmptyTextApartFromNone) {
  TextArena arena;
  EXPECT_FALSE(IsNone(arena.Copy("")));
  EXPECT_TRUE(IsNone(arena.Copy(kNoText)));
}

TEST(TextArena, KeepsCopiesWhileItGrows) {
  TextArena arena;
  std::vector<Text> copies;
  for (int i = 0; i < 20000; ++i) copies.push_back(arena.Copy("text number " + std::to_string(i)));
  for (int i = 0; i < 20000; ++i) ASSERT_EQ(copies[i], "text number " + std::to_string(i));
}

TEST(TextArena, UsesItsBlocksAgainAfterReset) {
  TextArena arena;
  const char* first = arena.Copy("abc").data();
  const std::string large(100000, 'x');
  const char* second = arena.Copy(large).data();
  for (int round = 0; round < 3; ++round) {
    arena.Reset();
    EXPECT_EQ(arena.Copy("def").data(), first);
    EXPECT_EQ(arena.Copy(large).data(), second);
  }
}

TEST(TextArena, AMovedFromArenaIsEmptyAndUsable) {
  TextArena arena;
  const Text kept = arena.Copy("abc");
  TextArena other = std::move(arena);
  const Text fresh = arena.Copy("xyz");  // NOLINT(bugprone-use-after-move): what is tested
  EXPECT_EQ(kept, "abc");
  EXPECT_EQ(fresh, "xyz");
  EXPECT_EQ(other.Copy("more"), "more");
}

TEST(Ref, TheLastReferenceEndsTheObject) {
  static int alive;
  struct Counted : RefCounted {
    Counted() { ++alive; }
    ~Counted() override { --alive; }
  };
  alive = 0;
  {
    Ref<Counted> a(new Counted);
    Ref<Counted> b = a;
    a = Ref<Counted>();
    EXPECT_EQ(alive, 1);
    Ref<Counted> c = std::move(b);
    EXPECT_FALSE(b);  // NOLINT(bugprone-use-after-move): what is tested
    EXPECT_TRUE(c);
  }
  EXPECT_EQ(alive, 0);
}

TEST(NumberMap, IsAMap) {
  NumberMap<uint32_t> map;
  EXPECT_EQ(map.Find(7), nullptr);
  std::unordered_map<uint64_t, uint32_t> wanted;
  uint64_t number = 1;
  for (uint32_t i = 0; i < 20000; ++i) {
    // Close together, far apart, and alike in their low bits.
    number = i % 3 == 0 ? number * 6364136223846793005u + 1442695040888963407u : number + (i % 3 == 1 ? 1 : 1u << 20);
    if (number == 0) continue;
    map.Put(number, i);
    wanted[number] = i;
    if (i % 5 == 0) map.Put(number, wanted[number] = i + 1);
  }
  EXPECT_EQ(map.size(), wanted.size());
  for (const auto& [key, value] : wanted) {
    ASSERT_NE(map.Find(key), nullptr) << key;
    EXPECT_EQ(*map.Find(key), value) << key;
    if (!wanted.contains(key + 2) && key + 2 != 0) {
      EXPECT_EQ(map.Find(key + 2), nullptr) << key;
    }
  }
  EXPECT_GE(map.ByteSize(), wanted.size() * 16);
  map.Clear();
  EXPECT_EQ(map.size(), 0u);
  EXPECT_EQ(map.Find(number), nullptr);
}

}  // namespace
}  // namespace quillet
