// Thompson's construction, the subset construction, and minimisation by splitting classes.
#include "grammar/automaton.h"

#include <algorithm>
#include <map>
#include <utility>

namespace quillet::pgen {
namespace {

// A rule of a real language has a few dozen states; the subset construction may be exponential.
constexpr size_t kMaxStates = 4000;

using Dfa = std::vector<Grammar::State>;

// ---- rules -> NFA ----

class Nfa {
 public:
  static constexpr int kFree = -1;  // the label of an arc that takes no token

  struct Fragment {
    int begin;
    int end;
  };

  explicit Nfa(const LabelOf& label_of) : label_of_(label_of) {}

  Fragment Build(const Expression& expression) {
    switch (expression.kind) {
      case Expression::Kind::kName:
      case Expression::Kind::kQuoted: {
        const Fragment fragment{NewState(), NewState()};
        AddArc(fragment.begin, label_of_(expression), fragment.end);
        return fragment;
      }
      case Expression::Kind::kSequence: {
        Fragment whole = Build(expression.parts[0]);
        for (size_t i = 1; i < expression.parts.size(); ++i) {
          const Fragment part = Build(expression.parts[i]);
          AddArc(whole.end, kFree, part.begin);
          whole.end = part.end;
        }
        return whole;
      }
      case Expression::Kind::kChoice: {
        const Fragment whole{NewState(), NewState()};
        for (const Expression& alternative : expression.parts) {
          const Fragment part = Build(alternative);
          AddArc(whole.begin, kFree, part.begin);
          AddArc(part.end, kFree, whole.end);
        }
        return whole;
      }
      case Expression::Kind::kOptional:
      case Expression::Kind::kAnyNumber:
      case Expression::Kind::kOneOrMore: {
        // States of its own, so that a loop's way back is no way around a neighbour.
        const Fragment whole{NewState(), NewState()};
        const Fragment part = Build(expression.parts[0]);
        AddArc(whole.begin, kFree, part.begin);
        AddArc(part.end, kFree, whole.end);
        if (expression.kind != Expression::Kind::kOneOrMore) AddArc(whole.begin, kFree, whole.end);
        if (expression.kind != Expression::Kind::kOptional) AddArc(part.end, kFree, part.begin);
        return whole;
      }
    }
    return {};
  }

  const std::vector<Grammar::Arc>& arcs(int state) const { return arcs_[static_cast<size_t>(state)]; }

  // Adds to `states` what is reached from them by free arcs; the result is sorted.
  void Close(std::vector<int>& states) const {
    std::vector<bool> seen(arcs_.size());
    for (const int state : states) seen[static_cast<size_t>(state)] = true;
    for (size_t i = 0; i < states.size(); ++i) {
      for (const Grammar::Arc& arc : arcs(states[i])) {
        if (arc.label != kFree || seen[static_cast<size_t>(arc.target)]) continue;
        seen[static_cast<size_t>(arc.target)] = true;
        states.push_back(arc.target);
      }
    }
    std::sort(states.begin(), states.end());
  }

 private:
  int NewState() {
    arcs_.emplace_back();
    return static_cast<int>(arcs_.size()) - 1;
  }
  void AddArc(int from, int label, int to) { arcs_[static_cast<size_t>(from)].push_back({label, to}); }

  const LabelOf& label_of_;
  std::vector<std::vector<Grammar::Arc>> arcs_;
};

// ---- NFA -> DFA ----

// Empty where the states are too many.
Dfa Determinise(const Nfa& nfa, const Nfa::Fragment& whole) {
  Dfa dfa;
  std::map<std::vector<int>, int> number_of_set;
  std::vector<std::vector<int>> sets;
  const auto state_for = [&](std::vector<int> set) {
    nfa.Close(set);
    set.erase(std::unique(set.begin(), set.end()), set.end());
    const auto [known, is_new] = number_of_set.emplace(set, static_cast<int>(sets.size()));
    if (is_new) sets.push_back(std::move(set));
    return known->second;
  };
  state_for({whole.begin});
  for (size_t i = 0; i < sets.size(); ++i) {
    if (sets.size() > kMaxStates) return {};
    std::map<int, std::vector<int>> targets;
    for (const int state : sets[i]) {
      for (const Grammar::Arc& arc : nfa.arcs(state)) {
        if (arc.label != Nfa::kFree) targets[arc.label].push_back(arc.target);
      }
    }
    Grammar::State state{{}, std::binary_search(sets[i].begin(), sets[i].end(), whole.end)};
    for (auto& [label, set] : targets) state.arcs.push_back({label, state_for(std::move(set))});
    dfa.push_back(std::move(state));
  }
  return dfa;
}

// ---- DFA -> minimised DFA ----

// Splits the states into classes until the states of a class agree in whether they end the rule
// and in the classes that their arcs lead to; a class is a state of the result.
Dfa Minimise(const Dfa& dfa) {
  std::vector<int> class_of(dfa.size());
  for (size_t i = 0; i < dfa.size(); ++i) class_of[i] = dfa[i].accepting;
  for (size_t class_count = 0;;) {
    std::map<std::pair<int, std::vector<std::pair<int, int>>>, int> classes;
    std::vector<int> refined(dfa.size());
    for (size_t i = 0; i < dfa.size(); ++i) {
      std::pair<int, std::vector<std::pair<int, int>>> behaviour{class_of[i], {}};
      for (const Grammar::Arc& arc : dfa[i].arcs) {
        behaviour.second.emplace_back(arc.label, class_of[static_cast<size_t>(arc.target)]);
      }
      refined[i] = classes.emplace(std::move(behaviour), static_cast<int>(classes.size())).first->second;
    }
    class_of = std::move(refined);
    if (classes.size() == class_count) break;
    class_count = classes.size();
  }

  Dfa minimal;
  std::vector<int> number_of_class(dfa.size(), -1);
  std::vector<size_t> representatives{0};
  number_of_class[static_cast<size_t>(class_of[0])] = 0;
  for (size_t i = 0; i < representatives.size(); ++i) {
    Grammar::State state{{}, dfa[representatives[i]].accepting};
    for (const Grammar::Arc& arc : dfa[representatives[i]].arcs) {
      const auto target = static_cast<size_t>(arc.target);
      int& number = number_of_class[static_cast<size_t>(class_of[target])];
      if (number < 0) {
        number = static_cast<int>(representatives.size());
        representatives.push_back(target);
      }
      state.arcs.push_back({arc.label, number});
    }
    minimal.push_back(std::move(state));
  }
  return minimal;
}

}  // namespace

std::vector<Grammar::State> BuildAutomaton(const RuleText& rule, const LabelOf& label_of, const GrammarSource& source) {
  Nfa nfa(label_of);
  const Nfa::Fragment whole = nfa.Build(rule.body);
  Dfa dfa = Determinise(nfa, whole);
  if (dfa.empty()) source.Fail(rule.line, "rule '" + rule.name + "' is too large");
  dfa = Minimise(dfa);
  if (dfa[0].accepting) source.Fail(rule.line, "rule '" + rule.name + "' can match nothing");
  return dfa;
}

}  // namespace quillet::pgen
