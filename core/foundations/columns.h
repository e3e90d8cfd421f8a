// Columns in the units that others count in: how many of them a text has, and how many bytes so many of them are.
//
// Units are bytes of UTF-8, the 16-bit units of UTF-16, or code points. Bytes that are no part of a well-formed
// character count as continuations of what stands in front of them, so that any bytes have columns.
#pragma once

#include <cstddef>
#include <cstdint>

#include "foundations/text.h"

namespace quillet {

enum class ColumnUnit : uint8_t { kUtf8, kUtf16, kUtf32 };

// How many units a text has.
size_t UnitsOf(Text text, ColumnUnit unit);

// The bytes of the characters in front of the unit of that number, the first being 0: of a unit within a character
// those in front of the character, and the whole text where it has not so many.
size_t BytesOfUnits(Text text, size_t units, ColumnUnit unit);

}  // namespace quillet
