// Bytes from a source or a file system as text that every format can hold.
//
// A source may hold any bytes, and so may the names in it. Whatever is handed on as text is UTF-8: a
// byte that is part of no character is shown as "\xff", as the host API shows it.
#pragma once

#include <string>

#include "foundations/text.h"

namespace quillet {

// Appends a text with its odd bytes as escapes.
void AppendShown(Text text, std::string& out);

}  // namespace quillet
