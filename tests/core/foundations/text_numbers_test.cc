// Numbers for texts: as a map from texts has them, whatever the texts are and however many come.
#include "foundations/text_numbers.h"

#include <gtest/gtest.h>

#include <deque>
#include <random>
#include <string>
#include <unordered_map>

namespace quillet {
namespace {

TEST(TextNumbers, CountFirstArrivals) {
  TextNumbers numbers;
  numbers.Begin(0);
  EXPECT_EQ(numbers.NumberOf("self"), 0u);
  EXPECT_EQ(numbers.NumberOf(""), 1u);
  EXPECT_EQ(numbers.NumberOf("self.a"), 2u);
  EXPECT_EQ(numbers.NumberOf(""), 1u);
  EXPECT_EQ(numbers.NumberOf("self"), 0u);
  EXPECT_EQ(numbers.size(), 3u);
  numbers.Begin(100);
  EXPECT_EQ(numbers.size(), 0u);
  EXPECT_EQ(numbers.NumberOf("self.a"), 0u);
}

TEST(TextNumbers, TellTextsThatAreNearlyEqualApart) {
  TextNumbers numbers;
  numbers.Begin(0);
  uint32_t next = 0;
  std::deque<std::string> texts;
  for (size_t size = 1; size < 40; ++size) {
    for (const char byte : {'a', 'b', '\0', '\xFF'}) {
      // Each place of a text counts, and so does how long it is.
      for (size_t at = 0; at < size; ++at) {
        texts.emplace_back(size, 'x');
        texts.back()[at] = byte;
        EXPECT_EQ(numbers.NumberOf(texts.back()), next++) << size << " " << at;
      }
    }
  }
  for (uint32_t i = 0; i < next; ++i) EXPECT_EQ(numbers.NumberOf(std::string(texts[i])), i);
}

TEST(TextNumbers, AreThoseOfAMapAtAnySize) {
  std::mt19937 random(7);
  TextNumbers numbers;
  // Large ones and small ones by turns, in the same memory.
  for (const size_t count : {10u, 200'000u, 50u, 3'000u, 1u, 400'000u, 64u}) {
    std::deque<std::string> texts;
    std::unordered_map<std::string, uint32_t> expected;
    numbers.Begin(count % 7 == 0 ? 0 : count);
    for (size_t i = 0; i < count; ++i) {
      const std::string& text =
          texts.emplace_back(std::to_string(random() % (count + 1)) + (i % 3 == 0 ? "" : ".name"));
      const uint32_t number = expected.try_emplace(text, static_cast<uint32_t>(expected.size())).first->second;
      ASSERT_EQ(numbers.NumberOf(text), number);
    }
    EXPECT_EQ(numbers.size(), expected.size());
  }
}

}  // namespace
}  // namespace quillet
