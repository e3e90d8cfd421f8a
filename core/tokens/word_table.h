// Which word of words.def a NAME is, without comparing text.
//
// Every word fits in eight bytes, so a name is one 64-bit number: eight bytes loaded, those past its
// length masked away. One multiplication sends it to a slot of a table in which no two words meet,
// and one comparison of numbers answers. The multiplier is searched for by the compiler; a word
// that is too long, or a list for which no multiplier is found, does not compile.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

namespace word_table {

inline constexpr unsigned kSlotBits = 8;
inline constexpr size_t kSlots = size_t{1} << kSlotBits;
inline constexpr size_t kMaxLength = 8;

struct Entry {
  Text text;
  TokenCode code;
};

inline constexpr Entry kWords[] = {
#define QUILLET_WORD(identifier, text) {text, word::k##identifier},
#include "tokens/words.def"
};

// The number a word is: its first byte lowest.
constexpr uint64_t NumberOf(Text text) {
  uint64_t number = 0;
  for (size_t i = text.size(); i-- > 0;) number = number << 8 | static_cast<unsigned char>(text[i]);
  return number;
}

constexpr size_t SlotOf(uint64_t number, uint64_t multiplier) { return (number * multiplier) >> (64 - kSlotBits); }

constexpr bool AllWordsFit() {
  for (const Entry& entry : kWords) {
    if (entry.text.empty() || entry.text.size() > kMaxLength) return false;
  }
  return true;
}
static_assert(AllWordsFit(), "a word is looked up by its first eight bytes");

constexpr bool IsPerfect(uint64_t multiplier) {
  bool taken[kSlots] = {};
  for (const Entry& entry : kWords) {
    const size_t slot = SlotOf(NumberOf(entry.text), multiplier);
    if (taken[slot]) return false;
    taken[slot] = true;
  }
  return true;
}

// The first of a fixed series of odd numbers that separates all words; 0 if a thousand do not.
constexpr uint64_t FindMultiplier() {
  uint64_t state = 0x9E3779B97F4A7C15u;
  for (int i = 0; i < 1000; ++i) {
    state = state * 6364136223846793005u + 1442695040888963407u;
    if (IsPerfect(state | 1)) return state | 1;
  }
  return 0;
}

inline constexpr uint64_t kMultiplier = FindMultiplier();
static_assert(kMultiplier != 0, "no multiplier separates the words: give the table more slots");

struct Table {
  uint64_t numbers[kSlots] = {};
  TokenCode codes[kSlots] = {};
};

// An empty slot holds the number 0, which no name is.
constexpr Table MakeTable() {
  Table table;
  for (const Entry& entry : kWords) {
    const size_t slot = SlotOf(NumberOf(entry.text), kMultiplier);
    table.numbers[slot] = NumberOf(entry.text);
    table.codes[slot] = entry.code;
  }
  return table;
}

inline constexpr Table kTable = MakeTable();

inline TokenCode CodeOfNumber(uint64_t number, size_t length) {
  const size_t slot = SlotOf(number, kMultiplier);
  return kTable.numbers[slot] == number && length <= kMaxLength ? kTable.codes[slot] : tok::NAME;
}

}  // namespace word_table

// CodeOfName for a name with at least eight readable bytes from its first on.
inline TokenCode CodeOfPaddedName(const char* text, size_t length) {
  if constexpr (std::endian::native == std::endian::little) {
    uint64_t number;
    std::memcpy(&number, text, sizeof number);
    const unsigned unused_bits = length >= 8 ? 0 : 64 - 8 * static_cast<unsigned>(length);
    number = number << unused_bits >> unused_bits;
    return word_table::CodeOfNumber(number, length);
  } else {
    return CodeOfName(text, length);
  }
}

}  // namespace quillet
