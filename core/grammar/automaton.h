// Second to fourth pass: a rule's expression becomes a minimised deterministic automaton.
//
// The alternatives of one rule may begin with the same items (subset construction takes them
// together); alternatives that begin with different items a same token can begin are the business
// of first_sets.h.
#pragma once

#include <functional>
#include <vector>

#include "grammar/grammar.h"
#include "grammar/grammar_text.h"

namespace quillet::pgen {

// The label of a name or a quoted text: a LabelId or a symbol number.
using LabelOf = std::function<int(const Expression&)>;

// The states of the rule, numbered breadth first; 0 begins. Arcs are ordered by label.
std::vector<Grammar::State> BuildAutomaton(const RuleText& rule, const LabelOf& label_of, const GrammarSource& source);

}  // namespace quillet::pgen
