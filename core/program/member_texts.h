// Whether a source may define a member of a class, told by its text alone.
#pragma once

#include "foundations/text.h"

namespace quillet {

// In the body of a class, or by an assignment to an attribute of `self`.
bool MayDefineMember(Text source, Text name);

// The same by an assignment to an attribute of anything, or by `__slots__`.
bool MayGiveMember(Text source, Text name);

}  // namespace quillet
