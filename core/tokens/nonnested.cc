// One pass over the bytes: brackets move the depth, quotes jump to the end of their string.
#include "tokens/nonnested.h"

#include <algorithm>
#include <cstring>

#include "foundations/errors.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// What a byte adds to the depth.
int NestingOf(char byte) {
  switch (byte) {
    case '(':
    case '[':
    case '{':
      return 1;
    case ')':
    case ']':
    case '}':
      return -1;
    default:
      return 0;
  }
}

}  // namespace

void InitNonNestedStruct(tNonNestedStruct& search, Text to_search, Text to_find, int64_t start, int64_t end) {
  const auto length = static_cast<int64_t>(std::min(to_search.find('\0'), to_search.size()));
  Assert(0 <= start && start <= length, "start outside the text");
  Assert(0 <= end && end <= length, "end outside the text");
  search.text = to_search.data();
  search.find = to_find.data();
  search.find_len = static_cast<int64_t>(to_find.size());
  if (to_find.empty()) {
    search.end = 0;
  } else {
    search.first_byte = to_find[0];
    search.end = end;
  }
  search.depth = 0;
  search.pos = start;
}

int64_t FindNextNonNestedStruct(tNonNestedStruct& search) {
  while (search.pos < search.end) {
    const int64_t at = search.pos++;
    const char byte = search.text[at];
    if (search.depth == 0 && byte == search.first_byte) {
      if (search.find_len == 1) return at;
      if (search.find_len <= search.end - at &&
          std::memcmp(search.text + at, search.find, static_cast<size_t>(search.find_len)) == 0) {
        search.pos = at + search.find_len;
        return at;
      }
    }
    search.depth += NestingOf(byte);
    if (IsQuote(byte)) search.pos = std::max(at + 1, FindStringEndNonNested(search.text, at, search.end));
  }
  return -1;
}

int64_t FindStringEndNonNested(const char* utf8_ptr, int64_t pos, int64_t end) {
  if (pos < 0 || pos >= end || !IsQuote(utf8_ptr[pos])) {
    ThrowError(ErrorKind::kValueError, "No string literal starts at position " + std::to_string(pos));
  }
  const char quote = utf8_ptr[pos];
  const bool triple = end - pos >= 3 && utf8_ptr[pos + 1] == quote && utf8_ptr[pos + 2] == quote;
  for (int64_t at = pos + (triple ? 3 : 1); at < end; ++at) {
    if (utf8_ptr[at] == '\\') {
      ++at;  // Raw strings, too, are not ended by an escaped quote.
    } else if (utf8_ptr[at] == quote) {
      if (!triple) return at + 1;
      if (end - at >= 3 && utf8_ptr[at + 1] == quote && utf8_ptr[at + 2] == quote) return at + 3;
    }
  }
  return end;
}

int64_t NonInlineNextNonNestedUtf8PtrIndex(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  if (IsQuote(utf8_ptr[pos])) return FindStringEndNonNested(utf8_ptr, pos, end_pos);
  int64_t depth = 0;
  while (pos < end_pos) {
    if (IsQuote(utf8_ptr[pos])) {
      pos = FindStringEndNonNested(utf8_ptr, pos, end_pos);
    } else {
      depth += NestingOf(utf8_ptr[pos++]);
    }
    if (depth <= 0) return pos;
  }
  return end_pos;
}

}  // namespace quillet
