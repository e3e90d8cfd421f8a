// Bits of floats, bytes in byte strings, classes of single bytes.
//
// A double travels through an integer field or a text as its 64 bits, with no numeric conversion, so
// that nothing of it is lost: a NaN keeps its payload.
#pragma once

#include <bit>
#include <cstdint>

#include "foundations/text.h"
#include "foundations/utf8.h"

namespace quillet {

inline uint64_t ULongLongValueForDoubleBits(double value) { return std::bit_cast<uint64_t>(value); }
inline double DoubleValueForULongLongBits(uint64_t bits) { return std::bit_cast<double>(bits); }

// Whether `sub` occurs in `whole`, each taken up to its first NUL byte.
inline bool StrInStr(Text sub, Text whole) {
  const auto up_to_nul = [](Text text) { return text.substr(0, text.find('\0')); };
  return up_to_nul(whole).find(up_to_nul(sub)) != Text::npos;
}

// A byte as the C locale has it. Numbers that are no byte, and 255, are of no class.
inline bool IsDigit(int64_t byte) {
  return byte >= 0 && byte < 255 && (AsciiClassOf(static_cast<char>(byte)) & kAsciiDigit);
}
inline bool IsAlnum(int64_t byte) {
  return byte >= 0 && byte < 255 && (AsciiClassOf(static_cast<char>(byte)) & (kAsciiAlpha | kAsciiDigit));
}

}  // namespace quillet
