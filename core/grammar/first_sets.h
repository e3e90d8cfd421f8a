// Fifth pass: which tokens begin a rule, and thereby whether one token decides each step.
//
// No rule can match nothing (automaton.h), so a rule begins with what the arcs of its first state
// begin with, and one that begins with itself never begins.
#pragma once

#include <bitset>
#include <vector>

#include "grammar/grammar.h"
#include "grammar/grammar_text.h"

namespace quillet::pgen {

using FirstSet = std::bitset<256>;  // of LabelIds

// By symbol number - kFirstSymbol. GrammarError for a rule that is left-recursive or has a state
// with two arcs that a same token can take.
std::vector<FirstSet> ComputeFirstSets(const Grammar& grammar, const GrammarSource& source);

}  // namespace quillet::pgen
