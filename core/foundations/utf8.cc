// The out-of-line half of the UTF-8 primitives: decoding by position, stepping, searching.
#include "foundations/utf8.h"

#include <algorithm>
#include <cstring>

#include "foundations/errors.h"

namespace quillet {

void AppendUtf8(uint32_t code_point, std::string& out) {
  const auto tail = [&](int shift) { out += static_cast<char>(0x80 | ((code_point >> shift) & 0x3F)); };
  if (code_point < 0x80) {
    out += static_cast<char>(code_point);
  } else if (code_point < 0x800) {
    out += static_cast<char>(0xC0 | code_point >> 6);
    tail(0);
  } else if (code_point < 0x10000) {
    out += static_cast<char>(0xE0 | code_point >> 12);
    tail(6);
    tail(0);
  } else {
    out += static_cast<char>(0xF0 | code_point >> 18);
    tail(12);
    tail(6);
    tail(0);
  }
}

bool IsWellFormedUtf8(Text text) {
  const char* at = text.data();
  const char* const end = at + text.size();
  while (at < end) {
    // Eight bytes of ASCII at a time.
    if (uint64_t word; end - at >= 8 && (std::memcpy(&word, at, 8), (word & 0x8080808080808080u) == 0)) {
      at += 8;
      continue;
    }
    const uint32_t length = DecodeUtf8(at, end).length;
    if (length == 0) return false;
    at += length;
  }
  return true;
}

size_t CharCountOfUtf8(Text text) {
  return static_cast<size_t>(std::count_if(text.begin(), text.end(), IsUtf8LeadByte));
}

uint32_t NonInlineUcs4CharAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  const DecodedChar decoded = DecodeUtf8(utf8_ptr + pos, utf8_ptr + end_pos);
  if (decoded.length == 0) {
    ThrowError(ErrorKind::kValueError, "Invalid UTF-8 at position " + std::to_string(pos));
  }
  return decoded.code_point;
}

uint8_t internal::HostClassAtUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t end_pos) {
  return CharClassOf(NonInlineUcs4CharAtUtf8Pos(utf8_ptr, pos, end_pos));
}

int64_t AdjustUtf8Pos(const char* utf8_ptr, int64_t pos, int64_t diff, int64_t end_pos) {
  while (pos > 0 && pos < end_pos && !IsUtf8LeadByte(utf8_ptr[pos])) --pos;
  if (diff > 0) {
    // In front of the text there is nothing to count, however far in front.
    if (pos < -1 && pos < end_pos) pos = std::min<int64_t>(-1, end_pos);
    while (pos < end_pos) {
      ++pos;
      if (pos == end_pos) break;
      if (pos >= 0 && IsUtf8LeadByte(utf8_ptr[pos]) && --diff == 0) break;
    }
  } else if (diff < 0) {
    if (pos < 0) return std::max(pos, INT64_MIN + 1) - 1;
    while (--pos >= 0) {
      if (IsUtf8LeadByte(utf8_ptr[pos]) && ++diff == 0) break;
    }
  }
  return pos;
}

int64_t PtrFindByte(const char* ptr, int64_t length, char c, int64_t start) {
  if (start < 0 || start >= length) ThrowError(ErrorKind::kValueError, "Invalid start");
  const void* found = std::memchr(ptr + start, c, static_cast<size_t>(length - start));
  return found == nullptr ? -1 : static_cast<const char*>(found) - ptr;
}

}  // namespace quillet
