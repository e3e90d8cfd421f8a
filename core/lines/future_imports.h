// What a source asks of its language by `from __future__ import ...`, as far as it changes how later
// statements are parsed: with the print function switched on, 2.7 has no print statement.
#pragma once

#include <span>

#include "lines/cutter.h"

namespace quillet {

// True where the source switches the print function on. Future imports stand in front of all other
// statements, but for a docstring; only those rows are looked at.
bool ImportsPrintFunction(const SourceText& source, std::span<const LineRow> rows);

}  // namespace quillet
