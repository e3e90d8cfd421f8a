// The rules of the language about the names of a scope: where `global` and `nonlocal` may stand and what they need,
// what a generator may return, and what 2.7 does not let a function do whose names a nested one uses.
#pragma once

#include <memory>

#include "analysis/name_rules.h"

namespace quillet {

std::unique_ptr<NameRules> MakeScopeRules(Version version);

}  // namespace quillet
