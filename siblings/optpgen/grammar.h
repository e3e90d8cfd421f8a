// Grammar tables: pgen notation in, flat arrays for the engine out.
//
// Named passes: text -> rules -> NFA -> DFA -> minimised DFA -> first sets -> tables. An undefined
// rule, a bad token name, a rule that can be empty where that matters, left recursion or an LL(1)
// conflict is a GrammarError that names file, line, rule and both alternatives.
//
// The tables know, for each state and each terminal, what happens to a token of that terminal: it
// is shifted, it enters a chain of rules, or the state's rule ends. A chain is the whole sequence of
// rules entered at once (expression rules are some fifteen deep), interned, so that an atom costs
// one step down; see engine.h for the way up.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <memory>
#include <vector>

#include "foundations/text.h"
#include "siblings/fastaccess/token.h"

namespace quillet {

// Names of token numbers and numbers of operators, as a grammar text refers to them. The defaults
// are the ids of token_ids.def.
struct TokenNames {
  std::unordered_map<std::string, int> name2number;
  std::unordered_map<std::string, int> op2number;

  static const TokenNames& Default();
};

class Grammar {
 public:
  using StateId = uint16_t;
  using ChainId = uint16_t;
  using LabelId = uint8_t;   // a terminal; at most 255 of them

  static constexpr int kFirstSymbol = 256;
  static constexpr LabelId kNoLabel = 255;

  // GrammarError for a text that is not a grammar; `filename` is named in messages.
  static Grammar Parse(Text text, const std::string& filename, const TokenNames& names = TokenNames::Default());
  // Reads the file; OSError that names it where that fails.
  static Grammar Load(const std::string& filename, const TokenNames& names = TokenNames::Default());

  // ---- what a host sees ----
  std::unordered_map<std::string, int> symbol2number;
  std::vector<std::string> symbol_names;  // by symbol number - kFirstSymbol
  // A rule's minimised DFA, for hosts and checks: per state the arcs (label, target) and whether
  // the rule may end there. A label below kFirstSymbol is a terminal's LabelId.
  struct Arc { int label; int target; };
  struct State { std::vector<Arc> arcs; bool accepting; };
  struct Rule { std::string name; int line; std::vector<State> states; };
  std::vector<Rule> rules;                // by symbol number - kFirstSymbol
  struct Label { int token_type; std::string keyword; };  // keyword empty for a token
  std::vector<Label> labels;              // by LabelId

  // ---- what the engine reads; sizes: states x labels, chains x labels ----
  // (described in tables.cc; the builder is free in its cells)
  size_t label_count = 0;
  // Label of a token by its code; kNoLabel where the grammar has no such terminal.
  std::array<LabelId, 256> label_of_code;
  // Keywords of the grammar that are not in words.def, by text; nearly always empty.
  std::unordered_map<std::string, LabelId> other_keywords;
  // Label of (type, value) as fed by a host.
  LabelId Classify(int type, Text value) const;

  struct Tables;
  const Tables& tables() const { return *tables_; }

 private:
  std::shared_ptr<const Tables> tables_;
};

}  // namespace quillet
