// Whether the names of a source have to be asked for what is wrong with them.
//
// Nearly every `global` and `nonlocal` is right, and it can be seen from the tokens around it: the name stands nowhere
// in front of it in its function, nobody annotates it, and for a `nonlocal` a function around binds it by a plain
// assignment or as a parameter. Only what cannot be seen so is worth the binding of all names (name_rules.h).
#pragma once

#include "analysis/file_analyzer.h"

namespace quillet {

// `declarations`: the rows that hold a `global` or `nonlocal`.
bool MayMisuseNames(const FileAnalyzer& analyzed, Version version, std::span<const uint32_t> declarations,
                    bool has_async_definitions);

}  // namespace quillet
