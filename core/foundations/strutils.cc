// Joining with one allocation, and digits without a stream.
#include "foundations/strutils.h"

#include <charconv>

namespace quillet {

std::string Utf8Concat5(Text s0, Text s1, Text s2, Text s3, Text s4) {
  std::string joined;
  joined.reserve(s0.size() + s1.size() + s2.size() + s3.size() + s4.size());
  for (const Text piece : {s0, s1, s2, s3, s4}) joined += piece;
  return joined;
}

void AppendInteger(int64_t number, std::string& out) {
  char digits[24];
  out.append(digits, std::to_chars(digits, digits + sizeof digits, number).ptr);
}

}  // namespace quillet
