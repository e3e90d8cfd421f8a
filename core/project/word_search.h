// Whether a word stands in a text as a whole word.
#pragma once

#include <bit>

#include "foundations/text.h"
#include "foundations/utf8.h"

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace quillet {

// A letter, a digit, an underscore, or a byte of a character beyond ASCII.
inline bool IsIdentifierByte(char byte) {
  return (AsciiClassOf(byte) & (kAsciiAlpha | kAsciiDigit | kAsciiUnderscore)) != 0 ||
         static_cast<unsigned char>(byte) >= 0x80;
}

inline bool IsWholeWordAt(Text text, size_t at, size_t size) {
  return (at == 0 || !IsIdentifierByte(text[at - 1])) &&
         (at + size == text.size() || !IsIdentifierByte(text[at + size]));
}

// Where it begins first at or behind `from`; Text::npos without one.
inline size_t FindWord(Text text, Text word, size_t from = 0) {
  const size_t size = word.size();
  if (size == 0 || size > text.size()) return Text::npos;
  size_t at = from;
#if defined(__SSE2__)
  // Sixteen places at a time, by the first and the last byte of the word.
  const __m128i first = _mm_set1_epi8(word.front());
  const __m128i last = _mm_set1_epi8(word.back());
  for (; at + size - 1 + 16 <= text.size(); at += 16) {
    const char* const block = text.data() + at;
    const __m128i begins = _mm_cmpeq_epi8(first, _mm_loadu_si128(reinterpret_cast<const __m128i*>(block)));
    const __m128i ends = _mm_cmpeq_epi8(last, _mm_loadu_si128(reinterpret_cast<const __m128i*>(block + size - 1)));
    auto found = static_cast<unsigned>(_mm_movemask_epi8(_mm_and_si128(begins, ends)));
    for (; found != 0; found &= found - 1) {
      const size_t place = at + static_cast<size_t>(std::countr_zero(found));
      if (text.compare(place, size, word) == 0 && IsWholeWordAt(text, place, size)) return place;
    }
  }
#endif
  for (at = text.find(word, at); at != Text::npos; at = text.find(word, at + 1)) {
    if (IsWholeWordAt(text, at, size)) return at;
  }
  return Text::npos;
}

inline bool HoldsWord(Text text, Text word) { return FindWord(text, word) != Text::npos; }

}  // namespace quillet
