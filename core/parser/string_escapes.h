// What is wrong with the escapes of a string literal, in the language's own words.
#pragma once

#include <string>

#include "foundations/text.h"

namespace quillet {

// Of a literal with its prefix and quotes; empty where nothing is. Not seen are names of characters that do not
// exist, and what stands behind the first field of a formatted string.
std::string WrongEscape(Text literal, bool python3);

}  // namespace quillet
