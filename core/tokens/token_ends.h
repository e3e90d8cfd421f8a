// Where a token ends, for the kinds that need more than a table: numbers, strings, names beyond
// ASCII.
//
// All functions may load up to 16 bytes behind `end`, and the byte at `end` must be a NUL: the
// padding of a SourceText. Strings end by the rules of the language alone; what becomes of one that
// does not end is the scanner's business.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tokens/byte_scan.h"
#include "tokens/token.h"
#include "tokens/word_table.h"

namespace quillet {

inline constexpr bool IsLineEnd(char c) { return c == '\n' || c == '\r'; }
inline constexpr bool IsQuote(char c) { return c == '"' || c == '\''; }

// Behind the "\n", "\r\n" or "\r" at `at`.
inline const char* LineEndEnd(const char* at) { return at + (at[0] == '\r' && at[1] == '\n' ? 2 : 1); }

// ---- numbers ----

// Digits with single underscores between them; `at` stands on a digit.
inline const char* DigitsEnd(const char* at) {
  for (;;) {
    do ++at;
    while (IsAsciiDigit(*at));
    if (*at != '_' || !IsAsciiDigit(at[1])) return at;
    ++at;
  }
}

// `at` stands on a "0" that a letter follows; null if the two begin no number of another base.
const char* BasedNumberEnd(const char* at);

// The number at a digit, or at a "." that a digit follows: the longest form of any version.
inline const char* NumberEnd(const char* at) {
  if (*at != '.') {
    if (*at == '0' && IsAsciiLetter(at[1])) {
      if (const char* end = BasedNumberEnd(at)) return end;
    }
    at = DigitsEnd(at);
    if (*at == 'l' || *at == 'L') return at + 1;
  }
  if (*at == '.') {
    ++at;
    if (IsAsciiDigit(*at)) at = DigitsEnd(at);
  }
  if (*at == 'e' || *at == 'E') {
    const char* exponent = at + (at[1] == '+' || at[1] == '-' ? 2 : 1);
    if (IsAsciiDigit(*exponent)) at = DigitsEnd(exponent);
  }
  return *at == 'j' || *at == 'J' ? at + 1 : at;
}

// ---- indentation ----

// Steps over the indentation of a line. `width` counts tabs to the next multiple of eight; a form
// feed starts it anew.
inline const char* IndentEnd(const char* line, uint32_t& width) {
  const char* at = BlanksEnd(line);
  width = static_cast<uint32_t>(at - line);
  for (;; ++at) {
    if (*at == ' ') {
      ++width;
    } else if (*at == '\t') {
      width = (width / 8 + 1) * 8;
    } else if (*at == '\f') {
      width = 0;
    } else {
      return at;
    }
  }
}

// ---- names ----

// The code of the name that begins at `at`; tok::ERRORTOKEN where none of ASCII letters stands.
inline TokenCode NameCodeAt(const char* at) {
  const char* end = AsciiIdentifierEnd(at);
  if (end == at || static_cast<unsigned char>(*end) >= 0x80) return tok::ERRORTOKEN;
  return CodeOfPaddedName(at, static_cast<size_t>(end - at));
}

// The end of the name that begins or goes on at `at`, where a byte of 0x80 or above stands. Returns
// `at` if the character there cannot (`initial`: begin, otherwise: go on with) a name.
const char* UnicodeNameEnd(const char* at, const char* end, bool initial);

// The end of what is no token at `at`: one character, or one byte of malformed UTF-8.
const char* StrayEnd(const char* at, const char* end);

// ---- strings ----

// What the letters in front of a quote say.
struct StringPrefix {
  bool valid = false;
  bool formatted = false;
  bool raw = false;
};

// `length` letters at `at`: r, u, b, f, and the pairs ur, br, rb, fr, rf, in any case.
inline StringPrefix PrefixOf(const char* at, size_t length) {
  const auto lower = [at](size_t i) { return static_cast<char>(at[i] | 0x20); };
  if (length == 0) return {true, false, false};
  if (length == 1) {
    const char c = lower(0);
    return {c == 'r' || c == 'u' || c == 'b' || c == 'f', c == 'f', c == 'r'};
  }
  if (length != 2) return {};
  const char a = lower(0), b = lower(1);
  const char other = a == 'r' ? b : a;
  const bool valid = (b == 'r' && (a == 'u' || a == 'b' || a == 'f')) || (a == 'r' && (b == 'b' || b == 'f'));
  return {valid, other == 'f', true};
}

// `t`, `tr` or `rt`, in any case: of strings that are a name and a string to the tokeniser.
inline bool IsTemplatePrefix(Text name) {
  const auto lower = [name](size_t i) { return static_cast<char>(name[i] | 0x20); };
  if (name.size() == 1) return lower(0) == 't';
  return name.size() == 2 && ((lower(0) == 't' && lower(1) == 'r') || (lower(0) == 'r' && lower(1) == 't'));
}

inline bool IsTripleQuote(const char* quote) { return quote[1] == quote[0] && quote[2] == quote[0]; }

template <char kQuote, class SeeEscape>
inline const char* TripleStringEndOf(const char* at, const char* end, SeeEscape see_escape) {
  at += 3;
  for (;;) {
    at = FindAny<kQuote, '\\'>(at, end);
    if (at >= end) return nullptr;
    if (*at == '\\') {
      see_escape(at);
      at += 2;
    } else if (IsTripleQuote(at)) {
      return at + 3;
    } else {
      ++at;
    }
  }
}

// Behind the triple-quoted string whose quotes stand at `at`; null if it does not end. `see_escape` gets each
// backslash.
template <class SeeEscape>
inline const char* TripleStringEnd(const char* at, const char* end, SeeEscape see_escape) {
  return *at == '"' ? TripleStringEndOf<'"'>(at, end, see_escape) : TripleStringEndOf<'\''>(at, end, see_escape);
}
inline const char* TripleStringEnd(const char* at, const char* end) {
  return TripleStringEnd(at, end, [](const char*) {});
}

// The first quote, backslash or line end in a string of one line, or `end`.
inline const char* FindInSingleString(const char* at, const char* end, char quote) {
  return quote == '"' ? FindAny<'"', '\\', '\n', '\r'>(at, end) : FindAny<'\'', '\\', '\n', '\r'>(at, end);
}

// Looks for the end of the string with single quotes at `at`. True: `stop` is behind it. False: it
// does not end, and `stop` is the place where that was seen.
bool FindSingleStringEnd(const char* at, const char* end, const char*& stop);

// Behind the string with single quotes at `at`; null if it does not end.
inline const char* SingleStringEnd(const char* at, const char* end) {
  const char* stop;
  return FindSingleStringEnd(at, end, stop) ? stop : nullptr;
}

// Behind the formatted string whose quotes stand at `at`, by the rules of 3.12 and later: its
// fields are code and may hold anything, the same quotes included. Null where it does not end, is
// nested too deeply, or a line within a field begins like a statement. `stop` (above `at`) is set to
// the place up to which bytes were looked at.
const char* NestedFormattedStringEnd(const char* at, const char* end, bool raw, const char*& stop);

}  // namespace quillet
