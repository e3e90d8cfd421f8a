// The bytes at both ends of a text as two numbers, and the hash of a text.
//
// Texts of up to 16 bytes are equal where their keys and their sizes are, so that nearly every look-up compares
// numbers and touches no bytes.
#pragma once

#include <cstdint>
#include <cstring>

#include "foundations/text.h"

namespace quillet {

struct TextKey {
  uint64_t first, last;

  friend bool operator==(const TextKey&, const TextKey&) = default;

  static TextKey Of(Text text) {
    const char* const at = text.data();
    const size_t size = text.size();
    if (size >= 8) return {Load<uint64_t>(at), Load<uint64_t>(at + size - 8)};
    if (size >= 4) return {Load<uint32_t>(at), Load<uint32_t>(at + size - 4)};
    if (size == 0) return {0, 0};
    const auto byte_at = [at](size_t i) { return uint64_t{static_cast<unsigned char>(at[i])}; };
    return {byte_at(0) << 16 | byte_at(size >> 1) << 8 | byte_at(size - 1), 0};
  }

  // Of the text that has this key.
  uint64_t HashOf(Text text) const {
    uint64_t hash = Mix(first + text.size(), last);
    for (size_t at = 8; at + 8 < text.size(); at += 8) [[unlikely]] hash = Mix(hash, Load<uint64_t>(text.data() + at));
    return hash ^ (hash >> 29);
  }

  // Whether two texts of one key and one size are equal.
  static bool AreSameInside(Text text, Text other) {
    return text.size() <= 16 || std::memcmp(text.data() + 8, other.data() + 8, text.size() - 16) == 0;
  }

 private:
  template <class Word>
  static uint64_t Load(const char* at) {
    Word word;
    std::memcpy(&word, at, sizeof word);
    return word;
  }
  static uint64_t Mix(uint64_t a, uint64_t b) {
    const uint64_t product = (a ^ 0x9E3779B97F4A7C15u) * 0xD6E8FEB86659FD93u + (b ^ (b >> 29)) * 0xA0761D6478BD642Fu;
    return (product ^ (product >> 32)) * 0xE7037ED1A0B428DBu;
  }
};

}  // namespace quillet
