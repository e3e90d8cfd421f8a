// Texts that are numbered: each once, in order of first arrival, behind its length, and all over again after Clear.
#include "corpus/column_texts.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <random>
#include <string>
#include <vector>

namespace quillet {
namespace {

std::string BehindItsLength(const std::string& text) {
  const auto length = static_cast<uint32_t>(text.size());
  std::string bytes(4, '\0');
  std::memcpy(bytes.data(), &length, 4);
  return bytes + text;
}

TEST(ColumnTexts, NumbersEachTextOnce) {
  std::mt19937 chance(3);
  ColumnTexts texts;
  // More in the first round than in the second one, whose table has the slots of the first.
  for (const size_t count : {size_t{60'000}, size_t{5'000}}) {
    std::map<std::string, uint32_t> numbers;
    std::string page;
    for (size_t i = 0; i < count; ++i) {
      // Many are equal but for a byte in the middle, and of every size.
      std::string text(chance() % 40, 'x');
      if (!text.empty()) text[text.size() / 2] = static_cast<char>('a' + chance() % 26);
      if (i % 2 == 0) text += std::to_string(chance() % count);
      const auto [at, is_new] = numbers.emplace(text, static_cast<uint32_t>(numbers.size()));
      if (is_new) page += BehindItsLength(text);
      const ColumnTexts::Asked asked(text);
      texts.FetchSlot(asked);
      texts.FetchText(asked);
      ASSERT_EQ(texts.NumberOf(asked), at->second) << text;
    }
    ASSERT_EQ(texts.size(), numbers.size());
    EXPECT_EQ(texts.byte_size(), page.size());
    EXPECT_EQ(texts.Page(0, static_cast<uint32_t>(texts.size())), page);
    for (const auto& [text, number] : numbers) {
      ASSERT_EQ(texts.TextOf(number), text);
      ASSERT_EQ(texts.Page(number, number + 1), BehindItsLength(text));
    }
    texts.Clear();
    EXPECT_EQ(texts.size(), 0u);
    EXPECT_EQ(texts.byte_size(), 0u);
  }
}

TEST(ColumnTexts, AnUncommonTextLeavesNothingBehind) {
  ColumnTexts texts;
  EXPECT_EQ(texts.NumberOf(std::string(size_t{40} << 20, 'x')), 0u);
  EXPECT_EQ(texts.NumberOf("y"), 1u);
  texts.Clear();
  EXPECT_EQ(texts.NumberOf("y"), 0u);
  EXPECT_EQ(texts.NumberOf(""), 1u);
  EXPECT_EQ(texts.Page(0, 2), BehindItsLength("y") + BehindItsLength(""));
}

}  // namespace
}  // namespace quillet
