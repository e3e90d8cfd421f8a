// Last pass: what each token does wherever a parse may stand, as flat arrays.
//
// A parse stands either in a state of a rule that has children already, or behind a chain: the
// sequence of rules that one token entered at once (an atom enters some fifteen expression rules),
// of which each has one child so far, the next rule of the chain. A chain is a sequence of states,
// that of each rule behind its first child; chains are numbered as nodes of a tree of their
// prefixes. Both kinds of place are a row here, and what a token does there is a cell:
//
//   a move     the token is taken. In a state row it is the state's own rule that takes it. In a
//              chain's row one rule of the chain takes it: those above it end with one child, which
//              takes their place, and vanish; the rule gets an entry on the stack, and the rules
//              below it stay, as the prefix in that entry. The token itself is either the next child
//              or enters a chain of its own.
//   kVanish    all rules of the chain end with one child, which becomes that of the top entry
//   kReduce    the top entry's rule ends; with the node it becomes its prefix goes on
//   the rest   the token is not acceptable
//
// Columns stand for labels; labels that behave alike everywhere share one, which makes the array
// small enough for the second-level cache.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <vector>

#include "grammar/first_sets.h"
#include "grammar/grammar.h"

namespace quillet {

struct Grammar::Tables {
  using Row = uint16_t;
  using Cell = uint16_t;

  // Rows that stand for no place in a rule.
  static constexpr Row kDeadRow = 0;  // after an error: nothing is taken any more
  static constexpr Row kDoneRow = 1;  // below the start symbol: its node is complete
  static constexpr Row kFirstRow = 2;
  static constexpr Row kNoPrefix = kDeadRow;

  // Cells that are no index into moves.
  static constexpr Cell kFirstSpecial = 0xFFF0;
  static constexpr Cell kVanish = 0xFFF0;
  static constexpr Cell kReduce = 0xFFF1;
  static constexpr Cell kBadInput = 0xFFF2;
  static constexpr Cell kTooMuchInput = 0xFFF3;
  static constexpr Cell kBadToken = 0xFFF4;
  static constexpr Cell kComplete = 0xFFF5;

  // Columns that stand for no label.
  static constexpr uint16_t kEndColumn = 0;       // no more tokens: what can end, ends
  static constexpr uint16_t kBadTokenColumn = 1;  // a token that the grammar does not have
  static constexpr uint16_t kFirstLabelColumn = 2;

  struct Move {
    Row state;        // the row of the taking rule's new state
    Row next;         // where the parse stands then: that row, or that of the chain entered
    Row prefix;       // of the entry that the rule gets
    uint16_t enters;  // 1: the rule gets an entry; 0: it has the top one
  };
  static_assert(sizeof(Move) == 8, "one load a token");

  uint32_t columns = 0;
  std::vector<Cell> cells;  // row * columns + column
  std::array<uint16_t, 256> column_of_label;
  std::vector<Move> moves;
  std::vector<uint16_t> symbol;  // by row: the rule of the state, or of the chain's last state
  std::vector<Row> prefix;       // by row: the chain without its last state, or kNoPrefix
  std::vector<Row> start_row;    // by symbol - kFirstSymbol
  // By row: the code of the token that may come here and without which the rule that cannot end here
  // never ends; tok::ENDMARKER where there is none. For messages.
  std::vector<TokenCode> needed;
};

namespace pgen {

// GrammarError for a grammar that has too many states or chains for the cells.
std::shared_ptr<const Grammar::Tables> BuildTables(const Grammar& grammar, const std::vector<FirstSet>& first_sets,
                                                   const GrammarSource& source);

}  // namespace pgen
}  // namespace quillet
