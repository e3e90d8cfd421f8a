#include "grammar/first_sets.h"

#include <string>

namespace quillet::pgen {
namespace {

bool IsSymbol(int label) { return label >= Grammar::kFirstSymbol; }
size_t RuleIndex(int label) { return static_cast<size_t>(label - Grammar::kFirstSymbol); }

std::string Spelling(const Grammar& grammar, int label) {
  return IsSymbol(label) ? grammar.rules[RuleIndex(label)].name : grammar.labels[static_cast<size_t>(label)].spelling;
}

// The rules so ordered that each stands behind those it can begin with.
std::vector<size_t> OrderByBeginnings(const Grammar& grammar, const GrammarSource& source) {
  enum class Mark : uint8_t { kNew, kOpen, kDone };
  struct Visit {
    size_t rule;
    size_t next_arc;
  };
  std::vector<Mark> marks(grammar.rules.size(), Mark::kNew);
  std::vector<size_t> order;
  std::vector<Visit> path;
  for (size_t root = 0; root < grammar.rules.size(); ++root) {
    if (marks[root] != Mark::kNew) continue;
    marks[root] = Mark::kOpen;
    path.push_back({root, 0});
    while (!path.empty()) {
      const size_t rule = path.back().rule;
      const std::vector<Grammar::Arc>& arcs = grammar.rules[rule].states[0].arcs;
      if (path.back().next_arc == arcs.size()) {
        marks[rule] = Mark::kDone;
        order.push_back(rule);
        path.pop_back();
        continue;
      }
      const int label = arcs[path.back().next_arc++].label;
      if (!IsSymbol(label)) continue;
      const size_t first = RuleIndex(label);
      if (marks[first] == Mark::kOpen) {
        const Grammar::Rule& culprit = grammar.rules[first];
        std::string message = "rule '" + culprit.name + "' begins with itself: ";
        size_t i = path.size();
        while (path[i - 1].rule != first) --i;
        for (; i <= path.size(); ++i) message += grammar.rules[path[i - 1].rule].name + " -> ";
        source.Fail(culprit.line, message + culprit.name);
      }
      if (marks[first] == Mark::kNew) {
        marks[first] = Mark::kOpen;
        path.push_back({first, 0});
      }
    }
  }
  return order;
}

// What can begin a step along `label`.
FirstSet Beginnings(const std::vector<FirstSet>& first_sets, int label) {
  if (IsSymbol(label)) return first_sets[RuleIndex(label)];
  FirstSet only;
  only.set(static_cast<size_t>(label));
  return only;
}

void CheckOneTokenDecides(const Grammar& grammar, const std::vector<FirstSet>& first_sets,
                          const GrammarSource& source) {
  for (const Grammar::Rule& rule : grammar.rules) {
    for (const Grammar::State& state : rule.states) {
      FirstSet taken;
      for (const Grammar::Arc& arc : state.arcs) {
        const FirstSet beginnings = Beginnings(first_sets, arc.label);
        const FirstSet both = beginnings & taken;
        if (both.none()) {
          taken |= beginnings;
          continue;
        }
        size_t token = 0;
        while (!both[token]) ++token;
        const Grammar::Arc* rival = state.arcs.data();
        while (!Beginnings(first_sets, rival->label)[token]) ++rival;
        source.Fail(rule.line, "rule '" + rule.name + "' is not LL(1): " + Spelling(grammar, static_cast<int>(token)) +
                                   " begins both " + Spelling(grammar, rival->label) + " and " +
                                   Spelling(grammar, arc.label));
      }
    }
  }
}

}  // namespace

std::vector<FirstSet> ComputeFirstSets(const Grammar& grammar, const GrammarSource& source) {
  std::vector<FirstSet> first_sets(grammar.rules.size());
  for (const size_t rule : OrderByBeginnings(grammar, source)) {
    for (const Grammar::Arc& arc : grammar.rules[rule].states[0].arcs) {
      first_sets[rule] |= Beginnings(first_sets, arc.label);
    }
  }
  CheckOneTokenDecides(grammar, first_sets, source);
  return first_sets;
}

}  // namespace quillet::pgen
