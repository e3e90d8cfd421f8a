#include "foundations/columns.h"

#include <algorithm>

#include "foundations/utf8.h"

namespace quillet {

namespace {

// What a byte adds: its character counts where it begins.
size_t UnitsOfByte(char byte, ColumnUnit unit) {
  const size_t leads = IsUtf8LeadByte(byte) ? 1 : 0;
  const size_t pairs = unit == ColumnUnit::kUtf16 && static_cast<unsigned char>(byte) >= 0xF0 ? 1 : 0;
  return leads + pairs;
}

}  // namespace

size_t UnitsOf(Text text, ColumnUnit unit) {
  if (unit == ColumnUnit::kUtf8) return text.size();
  size_t units = 0;
  for (const char byte : text) units += UnitsOfByte(byte, unit);
  return units;
}

size_t BytesOfUnits(Text text, size_t units, ColumnUnit unit) {
  if (unit == ColumnUnit::kUtf8) {
    size_t at = std::min(units, text.size());
    while (at > 0 && at < text.size() && !IsUtf8LeadByte(text[at])) --at;
    return at;
  }
  size_t at = 0;
  while (at < text.size()) {
    const size_t taken = UnitsOfByte(text[at], unit);
    if (taken > units) return at;
    units -= taken;
    ++at;
    while (at < text.size() && !IsUtf8LeadByte(text[at])) ++at;
  }
  return at;
}

}  // namespace quillet
