// Grammar tables: pgen notation in, flat arrays for the engine out.
//
// Named passes, a file each:
//   text -> rules              grammar_text.h   a tree of sequences, choices and repetitions a rule
//   rules -> NFA -> DFA
//     -> minimised DFA         automaton.h      the states of Grammar::rules
//   -> first sets              first_sets.h     with the checks that make the grammar LL(1)
//   -> tables                  tables.h         chains of rules, and what each token does in each state
// What is wrong with a text (notation, undefined rule, unknown token or operator, rule defined
// twice, rule that can match nothing, left recursion, two alternatives that begin alike) is a
// GrammarError that begins with file and line and names the rule and, of a conflict, both
// alternatives.
//
// As in pgen, a token that could both continue a rule and follow it continues it.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

// Names of token numbers and numbers of operators, as a grammar text refers to them. The defaults
// are the ids of token_ids.def.
struct TokenNames {
  std::unordered_map<std::string, int> name2number;
  std::unordered_map<std::string, int> op2number;

  static const TokenNames& Default();

  friend bool operator==(const TokenNames&, const TokenNames&) = default;
};

class Grammar {
 public:
  using LabelId = uint8_t;  // a terminal; at most 255 of them

  static constexpr int kFirstSymbol = 256;
  static constexpr LabelId kNoLabel = 255;

  // GrammarError for a text that is not a grammar; `filename` is named in messages.
  static Grammar Parse(Text text, const std::string& filename, const TokenNames& names = TokenNames::Default());
  // Reads the file; OSError that names it where that fails.
  static Grammar Load(const std::string& filename, const TokenNames& names = TokenNames::Default());
  // The same, for all that read the same text by the same names: the grammars of a process that were asked for
  // first are kept to its end, and are one object to all threads.
  static std::shared_ptr<const Grammar> Shared(const std::string& filename, const TokenNames& names);

  // ---- what a host sees ----
  // Rules are numbered from kFirstSymbol on, in the order of the file.
  std::unordered_map<std::string, int> symbol2number;
  std::vector<std::string> symbol_names;  // by symbol number - kFirstSymbol

  // A rule's minimised DFA, for hosts and checks: per state the arcs (label, target) and whether
  // the rule may end there. A label below kFirstSymbol is a terminal's LabelId. State 0 begins.
  struct Arc {
    int label;
    int target;
    friend bool operator==(const Arc&, const Arc&) = default;
  };
  struct State {
    std::vector<Arc> arcs;
    bool accepting;
  };
  struct Rule {
    std::string name;
    int line;
    std::vector<State> states;
  };
  std::vector<Rule> rules;  // by symbol number - kFirstSymbol

  // `keyword` is empty for a token; `spelling` is how the grammar text writes it: 'if', '+=', NAME.
  struct Label {
    int token_type;
    std::string keyword;
    std::string spelling;
  };
  std::vector<Label> labels;  // by LabelId

  // ---- labels of tokens ----
  // By the code of a token (default token ids only); kNoLabel where the grammar has no such terminal.
  std::array<LabelId, 256> label_of_code;
  // Keywords of the grammar that are not in words.def, by text; nearly always empty. A token with
  // the code of a plain NAME may be one of them.
  std::unordered_map<std::string, LabelId> other_keywords;
  // Of (type, value) as fed by a host: a keyword of the grammar by its text, else by the type.
  LabelId Classify(int type, Text value) const;
  // Of a token with a code.
  LabelId Classify(const Token& token) const {
    if (token.code == tok::NAME && !other_keywords.empty()) [[unlikely]]
      return Classify(tok::NAME, token.view());
    return label_of_code[token.code];
  }

  // ---- what the engine reads (tables.h) ----
  struct Tables;
  const std::shared_ptr<const Tables>& tables() const { return tables_; }

 private:
  Grammar() = default;

  int name_type_ = tok::NAME;
  std::unordered_map<std::string, LabelId> keyword_labels_;
  std::unordered_map<int, LabelId> token_labels_;
  std::shared_ptr<const Tables> tables_;
};

}  // namespace quillet
