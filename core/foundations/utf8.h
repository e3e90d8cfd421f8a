// Characters in UTF-8 bytes: decoding, stepping over boundaries, classifying.
//
// Positions are byte offsets from a pointer; `end_pos` is the offset at which reading stops, and no
// byte at or behind it is read. The ASCII case costs one table look-up and no call; only bytes of
// 0x80 and above are decoded, and those are classified by the host's Unicode tables. Malformed
// UTF-8 is a ValueError where a character is asked for by position; DecodeUtf8 reports it in its
// result and never throws.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>

#include "foundations/char_tables.h"
#include "foundations/text.h"

namespace quillet {

// True for a byte that begins a character: anything but 10xxxxxx.
inline constexpr bool IsUtf8LeadByte(char byte) { return (static_cast<unsigned char>(byte) & 0xC0) != 0x80; }

struct DecodedChar {
  uint32_t code_point = 0;
  uint32_t length = 0;  // in bytes; 0 where no well-formed character stands there
};

// The character at `at`. Overlong forms, surrogates and code points past 0x10FFFF are malformed, as
// is a character that `end` cuts off.
inline constexpr DecodedChar DecodeUtf8(const char* at, const char* end) {
  if (at >= end) return {};
  const auto byte_at = [at](int i) { return static_cast<unsigned char>(at[i]); };
  const uint32_t b0 = byte_at(0);
  if (b0 < 0x80) return {b0, 1};
  const ptrdiff_t left = end - at;
  const auto continues = [&](int i) { return (byte_at(i) & 0xC0u) == 0x80u; };
  if (b0 < 0xE0) {
    if (b0 < 0xC2 || left < 2 || !continues(1)) return {};
    return {(b0 & 0x1F) << 6 | (byte_at(1) & 0x3Fu), 2};
  }
  if (b0 < 0xF0) {
    if (left < 3 || !continues(1) || !continues(2)) return {};
    const uint32_t code_point = (b0 & 0x0F) << 12 | (byte_at(1) & 0x3Fu) << 6 | (byte_at(2) & 0x3Fu);
    if (code_point < 0x800 || (code_point >= 0xD800 && code_point < 0xE000)) return {};
    return {code_point, 3};
  }
  if (b0 > 0xF4 || left < 4 || !continues(1) || !continues(2) || !continues(3)) return {};
  const uint32_t code_point =
      (b0 & 0x07) << 18 | (byte_at(1) & 0x3Fu) << 12 | (byte_at(2) & 0x3Fu) << 6 | (byte_at(3) & 0x3Fu);
  if (code_point < 0x10000 || code_point >= kCodePointLimit) return {};
  return {code_point, 4};
}

// Appends a code point below kCodePointLimit; a surrogate is written as three bytes all the same.
void AppendUtf8(uint32_t code_point, std::string& out);

// True where all bytes form well-formed characters.
bool IsWellFormedUtf8(Text text);

// The number of characters of well-formed text; for any bytes, the number of lead bytes.
size_t CharCountOfUtf8(Text text);

// ---- ASCII, as C's <ctype.h> has it in the C locale ----

enum AsciiClass : uint8_t { kAsciiAlpha = 1, kAsciiDigit = 2, kAsciiSpace = 4, kAsciiUnderscore = 8 };

namespace internal {
inline constexpr std::array<uint8_t, 256> kAsciiClasses = [] {
  std::array<uint8_t, 256> table{};
  for (int c = 'a'; c <= 'z'; ++c) table[c] = kAsciiAlpha;
  for (int c = 'A'; c <= 'Z'; ++c) table[c] = kAsciiAlpha;
  for (int c = '0'; c <= '9'; ++c) table[c] = kAsciiDigit;
  for (int c = '\t'; c <= '\r'; ++c) table[c] = kAsciiSpace;
  table[' '] = kAsciiSpace;
  table['_'] = kAsciiUnderscore;
  return table;
}();
}  // namespace internal

// Bits of AsciiClass; 0 for bytes of 0x80 and above.
inline constexpr uint8_t AsciiClassOf(char byte) { return internal::kAsciiClasses[static_cast<unsigned char>(byte)]; }

// ---- characters by position ----

// Decodes the character at `pos`, which must be below `end_pos`; ValueError for malformed bytes.
uint32_t NonInlineUcs4CharAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos);

// The code point at `pos`; 0 at or past `end_pos`.
inline uint32_t Ucs4CharAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  if (pos >= end_pos) return 0;
  const auto byte = static_cast<unsigned char>(utf8_ptr[pos]);
  return byte < 0x80 ? byte : NonInlineUcs4CharAtUtf8Pos(utf8_ptr, pos, end_pos);
}

namespace internal {
// Bits of the host's tables for the character at `pos`.
uint8_t HostClassAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos);

inline bool IsClassAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos, uint8_t ascii, uint8_t host) {
  if (pos >= end_pos) return false;
  const char byte = utf8_ptr[pos];
  if (static_cast<unsigned char>(byte) < 0x80) return (AsciiClassOf(byte) & ascii) != 0;
  return (HostClassAtUtf8Pos(utf8_ptr, pos, end_pos) & host) != 0;
}
}  // namespace internal

// All four are false at or past `end_pos`.
inline bool IsSpaceAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  return internal::IsClassAtUtf8Pos(utf8_ptr, pos, end_pos, kAsciiSpace, kCharSpace);
}
inline bool IsDigitAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  return internal::IsClassAtUtf8Pos(utf8_ptr, pos, end_pos, kAsciiDigit, kCharDigit);
}
inline bool IsAlnumAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  return internal::IsClassAtUtf8Pos(utf8_ptr, pos, end_pos, kAsciiAlpha | kAsciiDigit, kCharAlnum);
}
// Whether the character may begin an identifier (`initial`) or stand anywhere in one. Beyond ASCII a
// character passes that is an identifier by itself, and behind the first place a digit, too.
inline bool IsIdentifierCharAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos, bool initial) {
  return internal::IsClassAtUtf8Pos(utf8_ptr, pos, end_pos,
                                    kAsciiAlpha | kAsciiUnderscore | (initial ? 0 : kAsciiDigit),
                                    kCharIdStart | (initial ? 0 : kCharDigit));
}

// `pos` moved by `diff` characters. A position inside a character is first moved back to that
// character's start. Forward it stops at `end_pos`; backward past the start it is negative. Backward
// the characters behind `end_pos` count, too, so `pos` must lie within the text.
int64_t AdjustUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t diff, int64_t end_pos);

// The offset of the first byte `c` in ptr[start:length], -1 if there is none. ValueError "Invalid
// start" unless 0 <= start < length.
int64_t PtrFindByte(const char* ptr, int64_t length, char c, int64_t start);

}  // namespace quillet
