// Chains first, since their number is the number of rows; then a row at a time, each chain's from
// that of its prefix: where the last rule of a chain can only end, its prefix decides.
#include "grammar/tables.h"

#include <map>
#include <string>
#include <tuple>
#include <utility>

namespace quillet::pgen {
namespace {

using Tables = Grammar::Tables;
using Row = Tables::Row;
using Cell = Tables::Cell;

constexpr size_t kMaxRows = 60000;
constexpr size_t kMaxMoves = Tables::kFirstSpecial;

class Builder {
 public:
  Builder(const Grammar& grammar, const std::vector<FirstSet>& first_sets, const GrammarSource& source)
      : grammar_(grammar), first_sets_(first_sets), source_(source), label_count_(grammar.labels.size()) {}

  std::shared_ptr<const Tables> Build() {
    NumberStates();
    FindSteps();
    NumberRows();
    FillFixedRows();
    for (size_t chain = 1; chain < chains_.size(); ++chain) FillChainRow(chain);
    for (size_t state = 0; state < states_.size(); ++state) FillStateRow(state);
    tables_->cells = ShareColumns();
    return std::move(tables_);
  }

 private:
  // What a label does in a state by itself.
  struct Step {
    enum class Kind : uint8_t { kError, kEnd, kTake };
    Kind kind = Kind::kError;
    uint32_t target = 0;  // state behind the child
    uint32_t chain = 0;   // that the token enters for this child; 0: it is the child
  };
  struct Chain {
    uint32_t prefix;
    uint32_t state;
  };

  [[noreturn]] void FailTooLarge() const { source_.Fail(1, "the grammar is too large for its tables"); }

  static size_t RuleIndex(int label) { return static_cast<size_t>(label - Grammar::kFirstSymbol); }

  void NumberStates() {
    for (size_t rule = 0; rule < grammar_.rules.size(); ++rule) {
      first_state_.push_back(static_cast<uint32_t>(states_.size()));
      for (const Grammar::State& state : grammar_.rules[rule].states) {
        states_.push_back(&state);
        rule_of_state_.push_back(static_cast<uint32_t>(rule));
      }
      if (states_.size() > kMaxRows) FailTooLarge();
    }
  }

  // The arc of a state that a label takes; null where there is none.
  const Grammar::Arc* ArcFor(size_t state, size_t label) const {
    for (const Grammar::Arc& arc : states_[state]->arcs) {
      if (arc.label < Grammar::kFirstSymbol ? static_cast<size_t>(arc.label) == label
                                            : first_sets_[RuleIndex(arc.label)][label]) {
        return &arc;
      }
    }
    return nullptr;
  }
  uint32_t Target(size_t state, const Grammar::Arc& arc) const {
    return first_state_[rule_of_state_[state]] + static_cast<uint32_t>(arc.target);
  }

  uint32_t InternChain(uint32_t prefix, uint32_t state) {
    const auto [known, is_new] = chain_numbers_.emplace(std::pair(prefix, state), chains_.size());
    if (is_new) {
      chains_.push_back({prefix, state});
      if (chains_.size() + states_.size() > kMaxRows) FailTooLarge();
    }
    return known->second;
  }

  // A child that can only begin in one way begins with a terminal that counts as the rule's own.
  int FirstLabelOf(int label) const {
    while (label >= Grammar::kFirstSymbol) {
      const Grammar::State& start = grammar_.rules[RuleIndex(label)].states[0];
      if (start.arcs.size() != 1) break;
      label = start.arcs[0].label;
    }
    return label;
  }

  // Whether a rule can go from a state to its end past all children that begin with this terminal.
  bool EndsWithout(size_t from, int label) const {
    const std::vector<Grammar::State>& states = grammar_.rules[rule_of_state_[from]].states;
    std::vector<bool> is_reached(states.size());
    std::vector<size_t> reached{from - first_state_[rule_of_state_[from]]};
    is_reached[reached[0]] = true;
    for (size_t i = 0; i < reached.size(); ++i) {
      const Grammar::State& state = states[reached[i]];
      if (state.accepting) return true;
      for (const Grammar::Arc& arc : state.arcs) {
        const auto target = static_cast<size_t>(arc.target);
        if (FirstLabelOf(arc.label) == label || is_reached[target]) continue;
        is_reached[target] = true;
        reached.push_back(target);
      }
    }
    return false;
  }

  // Of a state that does not end its rule: see Tables::needed.
  TokenCode NeededIn(size_t state) const {
    for (const Grammar::Arc& arc : states_[state]->arcs) {
      const int label = FirstLabelOf(arc.label);
      if (label >= Grammar::kFirstSymbol || EndsWithout(state, label)) continue;
      const auto& [type, keyword, spelling] = grammar_.labels[static_cast<size_t>(label)];
      if (!keyword.empty()) return CodeOfName(keyword.data(), keyword.size());
      return static_cast<TokenCode>(type);
    }
    return tok::ENDMARKER;
  }

  // The chain of rules that `label` enters where a child of this rule is to begin with it.
  uint32_t ChainInto(size_t rule, size_t label) {
    const auto [known, is_new] = entered_chains_.emplace(std::pair(rule, label), 0);
    if (!is_new) return known->second;
    uint32_t chain = 0;
    for (size_t state = first_state_[rule];;) {
      const Grammar::Arc* arc = ArcFor(state, label);
      chain = InternChain(chain, Target(state, *arc));
      if (arc->label < Grammar::kFirstSymbol) break;
      state = first_state_[RuleIndex(arc->label)];
    }
    return known->second = chain;
  }

  void FindSteps() {
    chains_.push_back({0, 0});  // the empty chain
    steps_.resize(states_.size() * label_count_);
    for (size_t state = 0; state < states_.size(); ++state) {
      for (size_t label = 0; label < label_count_; ++label) {
        Step& step = steps_[state * label_count_ + label];
        if (const Grammar::Arc* arc = ArcFor(state, label)) {
          step.kind = Step::Kind::kTake;
          step.target = Target(state, *arc);
          if (arc->label >= Grammar::kFirstSymbol) step.chain = ChainInto(RuleIndex(arc->label), label);
        } else if (states_[state]->accepting) {
          step.kind = Step::Kind::kEnd;
        }
      }
    }
  }

  Row RowOfChain(uint32_t chain) const {
    return chain == 0 ? Tables::kNoPrefix : static_cast<Row>(Tables::kFirstRow + chain - 1);
  }
  Row RowOfState(uint32_t state) const { return static_cast<Row>(Tables::kFirstRow + chains_.size() - 1 + state); }

  void NumberRows() {
    const size_t row_count = Tables::kFirstRow + chains_.size() - 1 + states_.size();
    wide_columns_ = Tables::kFirstLabelColumn + label_count_;
    wide_cells_.assign(row_count * wide_columns_, Tables::kBadInput);
    for (size_t row = 0; row < row_count; ++row) WideCell(row, Tables::kBadTokenColumn) = Tables::kBadToken;
    tables_->symbol.resize(row_count);
    tables_->needed.resize(row_count, tok::ENDMARKER);
    tables_->prefix.resize(row_count, Tables::kNoPrefix);
    for (const uint32_t state : first_state_) tables_->start_row.push_back(RowOfState(state));
  }

  void FillFixedRows() {
    for (size_t label = 0; label < label_count_; ++label) {
      WideCell(Tables::kDoneRow, Tables::kFirstLabelColumn + label) = Tables::kTooMuchInput;
    }
    WideCell(Tables::kDoneRow, Tables::kEndColumn) = Tables::kComplete;
  }

  void FillChainRow(size_t chain) {
    const uint32_t prefix = chains_[chain].prefix;
    const uint32_t state = chains_[chain].state;
    const Row row = RowOfChain(static_cast<uint32_t>(chain));
    const Row prefix_row = RowOfChain(prefix);
    tables_->symbol[row] = SymbolOfState(state);
    tables_->prefix[row] = prefix_row;
    tables_->needed[row] = states_[state]->accepting ? tables_->needed[prefix_row] : NeededIn(state);
    // Where the last rule ends, its prefix decides; below the first one there is none.
    const auto below = [&](size_t column) { return prefix == 0 ? Tables::kVanish : WideCell(prefix_row, column); };
    for (size_t label = 0; label < label_count_; ++label) {
      const size_t column = Tables::kFirstLabelColumn + label;
      const Step& step = steps_[state * label_count_ + label];
      if (step.kind == Step::Kind::kTake) WideCell(row, column) = MoveFor(step, prefix_row, true);
      if (step.kind == Step::Kind::kEnd) WideCell(row, column) = below(column);
    }
    if (states_[state]->accepting) WideCell(row, Tables::kEndColumn) = below(Tables::kEndColumn);
  }

  void FillStateRow(size_t state) {
    const Row row = RowOfState(static_cast<uint32_t>(state));
    tables_->symbol[row] = SymbolOfState(state);
    if (!states_[state]->accepting) tables_->needed[row] = NeededIn(state);
    for (size_t label = 0; label < label_count_; ++label) {
      const size_t column = Tables::kFirstLabelColumn + label;
      const Step& step = steps_[state * label_count_ + label];
      if (step.kind == Step::Kind::kTake) WideCell(row, column) = MoveFor(step, Tables::kNoPrefix, false);
      if (step.kind == Step::Kind::kEnd) WideCell(row, column) = Tables::kReduce;
    }
    if (states_[state]->accepting) WideCell(row, Tables::kEndColumn) = Tables::kReduce;
  }

  Cell MoveFor(const Step& step, Row prefix, bool enters) {
    const Row target = RowOfState(step.target);
    const Row next = step.chain == 0 ? target : RowOfChain(step.chain);
    const auto key = std::tuple(target, next, prefix, enters);
    const auto [known, is_new] = move_numbers_.emplace(key, static_cast<Cell>(tables_->moves.size()));
    if (is_new) {
      if (tables_->moves.size() >= kMaxMoves) FailTooLarge();
      tables_->moves.push_back({target, next, prefix, static_cast<uint16_t>(enters)});
    }
    return known->second;
  }

  uint16_t SymbolOfState(size_t state) const {
    return static_cast<uint16_t>(Grammar::kFirstSymbol + rule_of_state_[state]);
  }

  Cell& WideCell(size_t row, size_t column) { return wide_cells_[row * wide_columns_ + column]; }

  // Gives equal label columns one place, and sets column_of_label.
  std::vector<Cell> ShareColumns() {
    const size_t row_count = wide_cells_.size() / wide_columns_;
    std::map<std::vector<Cell>, uint16_t> column_numbers;
    std::vector<size_t> kept{Tables::kEndColumn, Tables::kBadTokenColumn};
    tables_->column_of_label.fill(Tables::kBadTokenColumn);
    for (size_t label = 0; label < label_count_; ++label) {
      std::vector<Cell> column(row_count);
      for (size_t row = 0; row < row_count; ++row) column[row] = WideCell(row, Tables::kFirstLabelColumn + label);
      const auto [known, is_new] = column_numbers.emplace(std::move(column), static_cast<uint16_t>(kept.size()));
      if (is_new) kept.push_back(Tables::kFirstLabelColumn + label);
      tables_->column_of_label[label] = known->second;
    }
    tables_->columns = static_cast<uint32_t>(kept.size());
    std::vector<Cell> cells;
    cells.reserve(row_count * kept.size());
    for (size_t row = 0; row < row_count; ++row) {
      for (const size_t column : kept) cells.push_back(WideCell(row, column));
    }
    return cells;
  }

  const Grammar& grammar_;
  const std::vector<FirstSet>& first_sets_;
  const GrammarSource& source_;
  const size_t label_count_;
  std::shared_ptr<Tables> tables_ = std::make_shared<Tables>();

  std::vector<const Grammar::State*> states_;  // of all rules
  std::vector<uint32_t> rule_of_state_;
  std::vector<uint32_t> first_state_;  // by rule
  std::vector<Step> steps_;            // state * label_count_ + label
  std::vector<Chain> chains_;          // a prefix stands before its chains; 0 is the empty chain
  std::map<std::pair<uint32_t, uint32_t>, uint32_t> chain_numbers_;
  std::map<std::pair<size_t, size_t>, uint32_t> entered_chains_;
  std::map<std::tuple<Row, Row, Row, bool>, Cell> move_numbers_;

  size_t wide_columns_ = 0;  // a column a label, before they are shared
  std::vector<Cell> wide_cells_;
};

}  // namespace

std::shared_ptr<const Grammar::Tables> BuildTables(const Grammar& grammar, const std::vector<FirstSet>& first_sets,
                                                   const GrammarSource& source) {
  return Builder(grammar, first_sets, source).Build();
}

}  // namespace quillet::pgen
