// Finding bytes outside all brackets and string literals, without a tokeniser.
//
// Works on bytes: everything that matters is ASCII and cannot occur inside a multi-byte character.
// The three kinds of brackets are not told apart, so "(]" balances; a depth that went below zero
// stays there until as many brackets open again. A string literal that is not closed reaches to the
// end of the search, which keeps every scan linear whatever the text.
#pragma once

#include <cstdint>

#include "foundations/text.h"

namespace quillet {

// A search under way. Whoever initialised it keeps text and pattern alive.
struct tNonNestedStruct {
  const char* text = nullptr;
  const char* find = nullptr;
  int64_t find_len = 0;
  char first_byte = 0;  // of the pattern; not set for an empty one
  int64_t pos = 0;      // of the next byte to look at
  int64_t end = 0;      // where the search stops
  int32_t depth = 0;    // of brackets; below 0 behind an unbalanced closing one
};

// Begins a search for `to_find` in to_search[start:end]. An empty pattern is found nowhere. Both
// bounds must lie within the text up to its first NUL byte (AssertionError).
void InitNonNestedStruct(tNonNestedStruct& search, Text to_search, Text to_find, int64_t start, int64_t end);

// The offset of the next match at depth 0, -1 if there is none. Overlapping matches count once. The
// match is tested before the nesting is updated, so a bracket can itself be found.
int64_t FindNextNonNestedStruct(tNonNestedStruct& search);

// The offset behind the string literal whose opening quote stands at `pos`; `end` for one that is
// not closed in front of it. ValueError where no quote stands at `pos`, or it is not below `end`.
int64_t FindStringEndNonNested(const char* utf8_ptr, int64_t pos, int64_t end);

// The offset behind the bracketed group or string literal that starts at `pos`, or behind the single
// byte that does; `end_pos` for a group or string that is not closed.
int64_t NonInlineNextNonNestedUtf8PtrIndex(const char* utf8_ptr, int64_t pos, int64_t end_pos);

// The same for a `pos` that may be past the end, which gives -1. A plain byte needs no call.
inline int64_t NextNonNestedUtf8PtrIndex(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  if (pos >= end_pos) return -1;
  switch (utf8_ptr[pos]) {
    case '(':
    case '[':
    case '{':
    case '"':
    case '\'':
      return NonInlineNextNonNestedUtf8PtrIndex(utf8_ptr, pos, end_pos);
    default:
      return pos + 1;
  }
}

}  // namespace quillet
