// One look at each backslash. Places are counted as the language's decoder sees them: a line end is one byte,
// and a character beyond ASCII is the ten of its own escape.
#include "parser/string_escapes.h"

#include <algorithm>
#include <cstring>

#include "foundations/utf8.h"
#include "tokens/byte_scan.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

struct LiteralParts {
  Text body;
  bool is_bytes = false;
  bool is_raw = false;
  bool is_unicode = false;
  bool is_formatted = false;
};

LiteralParts PartsOf(Text literal) {
  LiteralParts parts;
  size_t quote = 0;
  for (; quote < literal.size() && !IsQuote(literal[quote]); ++quote) {
    const char letter = static_cast<char>(literal[quote] | 0x20);
    parts.is_bytes |= letter == 'b';
    parts.is_raw |= letter == 'r';
    parts.is_unicode |= letter == 'u';
    parts.is_formatted |= letter == 'f' || letter == 't';
  }
  if (quote == literal.size()) return parts;
  const size_t width = literal.size() >= quote + 6 && IsTripleQuote(literal.data() + quote) ? 3 : 1;
  if (literal.size() >= quote + 2 * width)
    parts.body = literal.substr(quote + width, literal.size() - quote - 2 * width);
  return parts;
}

bool IsHexDigit(char c) { return IsAsciiDigit(c) || ((c | 0x20) >= 'a' && (c | 0x20) <= 'f'); }

// Where the language's decoder counts the byte at `at`.
size_t DecoderPlace(Text body, size_t at) {
  size_t place = 0;
  for (size_t i = 0; i < at;) {
    const auto byte = static_cast<unsigned char>(body[i]);
    if (byte >= 0x80) {
      i += std::max(DecodeUtf8(body.data() + i, body.data() + body.size()).length, 1u);
      place += 10;
    } else {
      place += !(byte == '\r' && i + 1 < body.size() && body[i + 1] == '\n');
      ++i;
    }
  }
  return place;
}

std::string UnicodeError(Text body, size_t begin, size_t end, const char* what) {
  return "(unicode error) 'unicodeescape' codec can't decode bytes in position " +
         std::to_string(DecoderPlace(body, begin)) + "-" + std::to_string(DecoderPlace(body, end) - 1) + ": " + what;
}

// Of the escape at `at`, whose letter takes `count` digits.
std::string WrongDigits(Text body, size_t at, size_t count, const char* what) {
  size_t end = at + 2;
  uint32_t value = 0;
  while (end < body.size() && end < at + 2 + count && IsHexDigit(body[end])) {
    const char c = body[end++];
    value = value * 16 + static_cast<uint32_t>(IsAsciiDigit(c) ? c - '0' : (c | 0x20) - 'a' + 10);
  }
  if (end < at + 2 + count) return UnicodeError(body, at, end, what);
  return value > 0x10FFFF ? UnicodeError(body, at, end, "illegal Unicode character") : std::string();
}

std::string WrongName(Text body, size_t at) {
  size_t end = at + 2;
  if (end < body.size() && body[end] == '{') {
    end = std::min(body.find('}', end), body.size());
    if (end < body.size() && end > at + 3) return {};
  }
  return UnicodeError(body, at, end, "malformed \\N character escape");
}

}  // namespace

std::string WrongEscape(Text literal, bool python3) {
  if (literal.empty() || std::memchr(literal.data(), '\\', literal.size()) == nullptr) return {};
  const LiteralParts parts = PartsOf(literal);
  if (parts.is_raw) return {};
  const bool is_text = python3 ? !parts.is_bytes : parts.is_unicode;
  const Text body = parts.body;
  for (size_t i = 0; i + 1 < body.size(); ++i) {
    if (parts.is_formatted && body[i] == '{') {
      if (body[i + 1] != '{') return {};
      ++i;
    }
    if (body[i] != '\\') continue;
    std::string wrong;
    switch (body[i + 1]) {
      case 'x':
        if (is_text)
          wrong = WrongDigits(body, i, 2, "truncated \\xXX escape");
        else if (i + 3 >= body.size() || !IsHexDigit(body[i + 2]) || !IsHexDigit(body[i + 3]))
          return python3 ? "(value error) invalid \\x escape at position " + std::to_string(DecoderPlace(body, i))
                         : "(value error) invalid \\x escape";
        break;
      case 'u':
        if (is_text) wrong = WrongDigits(body, i, 4, "truncated \\uXXXX escape");
        break;
      case 'U':
        if (is_text) wrong = WrongDigits(body, i, 8, "truncated \\UXXXXXXXX escape");
        break;
      case 'N':
        if (!is_text) break;
        wrong = WrongName(body, i);
        // The braces of a name begin no field.
        if (wrong.empty()) i = body.find('}', i) - 1;
        break;
      default:
        break;
    }
    if (!wrong.empty()) return wrong;
    ++i;
  }
  return {};
}

}  // namespace quillet
