// Whether a source may call a name, told by its text alone: so that files that only mention a name need not be read for
// its calls.
#pragma once

#include <cstdint>

#include "foundations/text.h"

namespace quillet {

enum class NameUse : uint8_t {
  kNone,         // it stands nowhere but in comments and plain strings
  kMentioned,    // it is neither called nor a decorator
  kMayBeCalled,  // or that is hard to tell
};

NameUse UseOfName(Text source, Text name);

}  // namespace quillet
