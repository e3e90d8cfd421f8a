// Joining byte strings, and the record of a place inside a text.
#pragma once

#include <cstdint>
#include <string>

#include "foundations/text.h"

namespace quillet {

// The pieces joined; absent ones are left out.
std::string Utf8Concat5(Text s0, Text s1, Text s2 = kNoText, Text s3 = kNoText, Text s4 = kNoText);

// The length in UTF-8 bytes, the unit of all columns.
inline int64_t Utf8Len(Text text) { return static_cast<int64_t>(text.size()); }

// The decimal digits of a number, with "-" in front of a negative one.
void AppendInteger(int64_t number, std::string& out);
inline std::string BytesForInteger(int64_t number) {
  std::string digits;
  AppendInteger(number, digits);
  return digits;
}

// A place inside a text that may span lines: the line, and the column in that line in characters and
// in UTF-8 bytes, all from 0; -1 for a column that is not known.
struct TextPosInfo {
  int64_t lineno = 0;
  int64_t char_col = -1;
  int64_t utf8_col = -1;
  friend bool operator==(const TextPosInfo&, const TextPosInfo&) = default;
};

}  // namespace quillet
