// A number is a pair of parts, each so many digits and a power of ten; a string is its contents behind a letter.
#include "parser/key_literal.h"

#include <algorithm>
#include <charconv>
#include <cstdint>

#include "foundations/utf8.h"
#include "lines/token_search.h"
#include "tokens/byte_scan.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// The value of a number's literal, without the letter of an imaginary one, as digits and a power of ten. One that is
// too long for its base is its own.
std::string ValueOfNumber(Text literal) {
  std::string text;
  for (const char c : literal)
    if (c != '_') text += static_cast<char>(c | 0x20);
  const int base = text.starts_with("0x") ? 16 : text.starts_with("0o") ? 8 : text.starts_with("0b") ? 2 : 10;
  if (base != 10) {
    uint64_t integer = 0;
    const char* const end = text.data() + text.size();
    if (std::from_chars(text.data() + 2, end, integer, base).ec != std::errc()) return text;
    text = std::to_string(integer);
  }
  std::string digits;
  int64_t exponent = 0;
  bool is_fraction = false;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] == 'e') {
      int32_t power = 0;
      i += text[i + 1] == '+';
      std::from_chars(text.data() + i + 1, text.data() + text.size(), power);
      exponent += power;
      break;
    }
    if (!IsAsciiDigit(text[i])) {
      is_fraction = true;
      continue;
    }
    exponent -= is_fraction;
    if (text[i] != '0' || !digits.empty()) digits += text[i];
  }
  for (; digits.ends_with('0'); digits.pop_back()) ++exponent;
  return digits.empty() ? "0" : digits + "e" + std::to_string(exponent);
}

std::string Negative(const std::string& part) { return part == "0" ? part : "-" + part; }

uint32_t DigitsAt(Text text, size_t at, size_t count, int base) {
  uint32_t value = 0;
  std::from_chars(text.data() + at, text.data() + std::min(at + count, text.size()), value, base);
  return value;
}

void AppendCharacter(std::string& out, uint32_t code_point, bool is_bytes) {
  if (is_bytes)
    out += static_cast<char>(code_point);
  else
    AppendUtf8(code_point, out);
}

// What the letter behind a backslash stands for by itself, or 0.
char PlainEscape(char letter) {
  switch (letter) {
    case 'a':
      return '\a';
    case 'b':
      return '\b';
    case 'f':
      return '\f';
    case 'n':
      return '\n';
    case 'r':
      return '\r';
    case 't':
      return '\t';
    case 'v':
      return '\v';
    case '\\':
    case '"':
    case '\'':
      return letter;
    default:
      return 0;
  }
}

void AppendContents(std::string& out, Text body, bool is_raw, bool is_bytes) {
  for (size_t i = 0; i < body.size(); ++i) {
    if (is_raw || body[i] != '\\' || i + 1 == body.size()) {
      out += body[i];
      continue;
    }
    const char letter = body[++i];
    const size_t digits = letter == 'x' ? 2 : is_bytes ? 0 : letter == 'u' ? 4 : letter == 'U' ? 8 : 0;
    if (const char plain = PlainEscape(letter)) {
      out += plain;
    } else if (digits != 0) {
      AppendCharacter(out, DigitsAt(body, i + 1, digits, 16), is_bytes);
      i += digits;
    } else if (letter >= '0' && letter <= '7') {
      size_t count = 1;
      while (count < 3 && i + count < body.size() && body[i + count] >= '0' && body[i + count] <= '7') ++count;
      AppendCharacter(out, DigitsAt(body, i, count, 8), is_bytes);
      i += count - 1;
    } else if (!IsLineEnd(letter)) {
      out += '\\';
      out += letter;
    }
  }
}

}  // namespace

KeyLiteral::KeyLiteral(TokenSpan toks) : toks_(toks) {
  switch (toks[0].code) {
    case word::kTrue:
      value_ = ValueOfNumber("1");
      break;
    case word::kFalse:
      value_ = ValueOfNumber("0");
      break;
    case word::kNone:
      value_ = "None";
      break;
    case tok::STRING:
      ReadStrings();
      break;
    default:
      ReadNumber();
  }
}

void KeyLiteral::ReadNumber() {
  std::string real = "0";
  std::string imaginary = "0";
  bool is_negative = false;
  for (const Token& token : toks_) {
    if (token.code == tok::MINUS) is_negative = true;
    if (token.code != tok::NUMBER) continue;
    Text literal = token.view();
    const bool is_imaginary = (literal.back() | 0x20) == 'j';
    if (is_imaginary) literal.remove_suffix(1);
    const std::string part = ValueOfNumber(literal);
    (is_imaginary ? imaginary : real) = is_negative ? Negative(part) : part;
    is_negative = false;
  }
  value_ = imaginary == "0" ? real : real + "+" + imaginary + "j";
}

void KeyLiteral::ReadStrings() {
  for (const Token& token : toks_) {
    if (token.code != tok::STRING) continue;
    const Text literal = token.view();
    size_t quote = 0;
    bool is_raw = false;
    bool is_bytes = false;
    for (; !IsQuote(literal[quote]); ++quote) {
      is_raw |= (literal[quote] | 0x20) == 'r';
      is_bytes |= (literal[quote] | 0x20) == 'b';
    }
    if (value_.empty()) value_ = is_bytes ? "b" : "s";
    const size_t width = literal.size() >= quote + 6 && IsTripleQuote(literal.data() + quote) ? 3 : 1;
    AppendContents(value_, literal.substr(quote + width, literal.size() - quote - 2 * width), is_raw, is_bytes);
  }
}

std::string KeyLiteral::Shown() const {
  std::string shown;
  if (toks_[0].code != tok::STRING) {
    for (const Token& token : toks_)
      if (!IsSkipCode(token.code)) shown.append(token.view());
    const bool is_sum = shown.find_first_of("+-", 1) != std::string::npos && (shown.back() | 0x20) == 'j';
    return is_sum ? "(" + shown + ")" : shown;
  }
  const Text contents = Text(value_).substr(1);
  const bool has_single = contents.find('\'') != Text::npos;
  const char quote = has_single && contents.find('"') == Text::npos ? '"' : '\'';
  if (value_[0] == 'b') shown += 'b';
  shown += quote;
  for (const char c : contents) {
    if (c == quote || c == '\\') shown += '\\';
    switch (c) {
      case '\n':
        shown += "\\n";
        break;
      case '\r':
        shown += "\\r";
        break;
      case '\t':
        shown += "\\t";
        break;
      default:
        shown += c;
    }
  }
  return shown + quote;
}

}  // namespace quillet
