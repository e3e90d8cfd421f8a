// Runs of plain bytes are copied whole; a table says which bytes end one.
#include "site/html_text.h"

#include <array>
#include <charconv>

#include "foundations/utf8.h"

namespace quillet {

namespace {

constexpr std::array<bool, 256> kIsPlain = [] {
  std::array<bool, 256> plain{};
  for (int c = 0x20; c < 0x7F; ++c) plain[static_cast<size_t>(c)] = true;
  plain['\t'] = true;
  for (const char c : {'&', '<', '>', '"', '\''}) plain[static_cast<size_t>(c)] = false;
  return plain;
}();

// What shows nothing of itself, or changes how its neighbours are shown.
bool IsHidden(uint32_t c) {
  return (c >= 0x80 && c < 0xA0) || c == 0x061C || c == 0x200E || c == 0x200F || (c >= 0x2028 && c <= 0x202E) ||
         (c >= 0x2066 && c <= 0x2069);
}

void AppendEscaped(uint32_t c, std::string& out) {
  constexpr char kDigits[] = "0123456789abcdef";
  out += "\\u";
  for (int shift = 12; shift >= 0; shift -= 4) out += kDigits[c >> shift & 15];
}

// Appends what stands for the character at `at`, and gives the byte behind it.
const char* AppendOther(const char* at, const char* end, std::string& out) {
  switch (*at) {
    case '&':
      out += "&amp;";
      return at + 1;
    case '<':
      out += "&lt;";
      return at + 1;
    case '>':
      out += "&gt;";
      return at + 1;
    case '"':
      out += "&quot;";
      return at + 1;
    case '\'':
      out += "&#x27;";
      return at + 1;
  }
  const DecodedChar c = DecodeUtf8(at, end);
  if (c.length == 0) {
    AppendUtf8(0xFFFD, out);
    return at + 1;
  }
  if (c.code_point < 0x20)
    AppendUtf8(0x2400 + c.code_point, out);
  else if (c.code_point == 0x7F)
    AppendUtf8(0x2421, out);
  else if (IsHidden(c.code_point))
    AppendEscaped(c.code_point, out);
  else
    out.append(at, c.length);
  return at + c.length;
}

}  // namespace

void AppendHtml(Text text, std::string& out) {
  const char* const end = text.data() + text.size();
  const char* plain = text.data();
  for (const char* at = plain; at < end;) {
    if (kIsPlain[static_cast<uint8_t>(*at)]) [[likely]] {
      ++at;
      continue;
    }
    out.append(plain, at);
    plain = at = AppendOther(at, end, out);
  }
  out.append(plain, end);
}

void AppendDigits(uint64_t number, std::string& out) {
  char digits[20];
  out.append(digits, std::to_chars(digits, digits + sizeof(digits), number).ptr);
}

}  // namespace quillet
