// Text of a source as content of a page of HTML: nothing in it is markup, and everything is seen.
//
// Control characters, and those that would reverse or break the text around them, are shown by pictures or
// escapes; a byte that is part of no character by the replacement character.
#pragma once

#include <cstdint>
#include <string>

#include "foundations/text.h"

namespace quillet {

void AppendHtml(Text text, std::string& out);

// Digits, which every format of the site needs.
void AppendDigits(uint64_t number, std::string& out);

}  // namespace quillet
