// Runs of bytes, sixteen at a time: where a run of blanks or of identifier characters ends, and
// where the next of a few given bytes stands.
//
// All of them may load up to 16 bytes behind `end`, which must be readable (SourceText pads its
// bytes by more). Without SSE2 the same functions go byte by byte.
#pragma once

#include <bit>
#include <cstdint>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace quillet {

inline constexpr bool IsAsciiDigit(char c) { return c >= '0' && c <= '9'; }
inline constexpr bool IsAsciiLetter(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }
inline constexpr bool IsAsciiIdentifierByte(char c) { return IsAsciiLetter(c) || IsAsciiDigit(c) || c == '_'; }

#if defined(__SSE2__)

namespace byte_scan {

inline __m128i Load(const char* at) { return _mm_loadu_si128(reinterpret_cast<const __m128i*>(at)); }
inline unsigned MaskOf(__m128i bytes) { return static_cast<unsigned>(_mm_movemask_epi8(bytes)); }

// Bytes in low..low + width - 1: the difference to `low`, as an unsigned byte, is below `width`.
inline __m128i InRange(__m128i bytes, char low, char width) {
  const __m128i offset = _mm_sub_epi8(bytes, _mm_set1_epi8(low));
  return _mm_cmpeq_epi8(_mm_min_epu8(offset, _mm_set1_epi8(static_cast<char>(width - 1))), offset);
}

// One bit a byte that is a letter, a digit or "_".
inline unsigned IdentifierMask(const char* at) {
  const __m128i bytes = Load(at);
  const __m128i letters = InRange(_mm_or_si128(bytes, _mm_set1_epi8(0x20)), 'a', 26);
  const __m128i digits = InRange(bytes, '0', 10);
  const __m128i underscores = _mm_cmpeq_epi8(bytes, _mm_set1_epi8('_'));
  return MaskOf(_mm_or_si128(_mm_or_si128(letters, digits), underscores));
}

template <char... kBytes>
inline unsigned AnyMask(const char* at) {
  const __m128i bytes = Load(at);
  __m128i found = _mm_setzero_si128();
  ((found = _mm_or_si128(found, _mm_cmpeq_epi8(bytes, _mm_set1_epi8(kBytes)))), ...);
  return MaskOf(found);
}

}  // namespace byte_scan

// The end of the run of ASCII identifier characters at `at`. The padding ends every run.
inline const char* AsciiIdentifierEnd(const char* at) {
  unsigned others = byte_scan::IdentifierMask(at) ^ 0xFFFFu;
  while (others == 0) [[unlikely]] {
      at += 16;
      others = byte_scan::IdentifierMask(at) ^ 0xFFFFu;
    }
  return at + std::countr_zero(others);
}

// The end of the run of blanks (only these) at `at`.
inline const char* BlanksEnd(const char* at) {
  unsigned others = byte_scan::AnyMask<' '>(at) ^ 0xFFFFu;
  while (others == 0) {
    at += 16;
    others = byte_scan::AnyMask<' '>(at) ^ 0xFFFFu;
  }
  return at + std::countr_zero(others);
}

// The first of the given bytes in [at, end), or `end`.
template <char... kBytes>
inline const char* FindAny(const char* at, const char* end) {
  while (at < end) {
    const unsigned found = byte_scan::AnyMask<kBytes...>(at);
    if (found != 0) {
      at += std::countr_zero(found);
      return at < end ? at : end;
    }
    at += 16;
  }
  return end;
}

#else

inline const char* AsciiIdentifierEnd(const char* at) {
  while (IsAsciiIdentifierByte(*at)) ++at;
  return at;
}

inline const char* BlanksEnd(const char* at) {
  while (*at == ' ') ++at;
  return at;
}

template <char... kBytes>
inline const char* FindAny(const char* at, const char* end) {
  while (at < end && !((*at == kBytes) || ...)) ++at;
  return at;
}

#endif

}  // namespace quillet
