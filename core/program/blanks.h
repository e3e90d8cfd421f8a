// What stands between the words of a line.
#pragma once

namespace quillet {

inline bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\f'; }

}  // namespace quillet
