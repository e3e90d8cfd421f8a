// Where the hint stands in a comment of the form "# type: X".
#pragma once

#include <cstddef>

#include "foundations/text.h"

namespace quillet {

// The bytes of a hint within its comment: from behind "type:" to the last character that counts.
struct TypeCommentHint {
  bool found = false;
  size_t begin = 0;
  size_t end = 0;
};

// Only a "#" and white space may stand between the last comment sign and the first "type:"; a second
// comment behind the hint is cut off; the bare word "ignore" is no hint. A hint may be empty.
TypeCommentHint FindTypeCommentHint(Text comment);

}  // namespace quillet
