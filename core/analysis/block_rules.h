// What the statements of a file may not say to each other: indentation, blocks that are missing, clauses without
// what they are clauses of, and statements in a place where they mean nothing.
//
// One pass over the rows, and another one where the readings of the rows told something. A stack holds the open blocks,
// by their indentation; each knows what heads it, which clauses may come next in it and in which definitions it stands:
// the places of the rows are told by the way, as a ScopeTracker tells them. A statement that its own reading rejected
// says little about what was meant: nothing is concluded from it, so that one fault is told once.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "analysis/line_result.h"
#include "foundations/errors.h"
#include "lines/cutter.h"

namespace quillet {

class BlockRules {
 public:
  struct Finding {
    size_t row;
    SyntaxError::Kind kind;
    std::string message;
    Context place;     // a token of the row, or a position that counts lines from its first one
    bool comes_first;  // also where the row's own reading found something
  };
  // A case without a guard that matches everything: what that makes of the cases behind it, and at which token.
  struct Irrefutable {
    size_t row;
    int32_t at;
    std::string words;
  };
  // What the readings of the rows told, in their order.
  struct Readings {
    std::vector<size_t> rejected;  // by the grammar
    std::vector<Irrefutable> irrefutable;

    void Clear() {
      rejected.clear();
      irrefutable.clear();
    }
    bool tell_nothing() const { return rejected.empty() && irrefutable.empty(); }
  };

  // What a kind of row is to the blocks.
  enum class Role : uint8_t {
    kBlank,
    kComment,
    kOther,  // jumps
    kPlain,  // a statement that holds no others, or a decorator
    kImport,
    kHead,
    kDefinitionHead,
    kClause,
    kTry,
    kExcept,
    kMatch,
  };

  // As far as what stands inside depends on it.
  enum class Head : uint8_t { kFile, kPlain, kLoop, kDefinition, kExceptStar, kFinally, kMatch, kUnknown };
  // Which clauses may come next: those of the statement that stands last in a block. From kTry on something has to;
  // kWrong is no such state.
  enum class Clauses : uint8_t { kNone, kElse, kElif, kExcept, kTryElse, kUnknown, kTry, kDecorated, kCase, kWrong };

  // What is wrong is in findings(). Fills in the places of the rows, which do not depend on the readings. The source
  // was cut completely.
  void Check(const SourceText& source, std::span<const LineRow> rows, Version version, const Readings& readings,
             std::span<LineResult> places);

  std::vector<Finding>& findings() { return findings_; }
  // The rows that are imports.
  const std::vector<uint32_t>& imports() const { return imports_; }
  // What gives reason to look at the names of the source (name_rules.h): the rows that hold `global` or `nonlocal`.
  const std::vector<uint32_t>& declarations() const { return declarations_; }
  bool has_async_definitions() const { return has_async_definitions_; }

 private:
  static constexpr uint32_t kNoRow = UINT32_MAX;

  // What makes the next row one to look at.
  enum Watch : uint8_t { kHead = 1, kRejection = 2, kFutureImports = 4, kStarredExcept = 8, kTabs = 16 };

  struct Block {
    uint32_t column;
    uint32_t narrow_column;  // with tabs one wide
    LinePlace place;         // of its rows, but for the first one
    Head head;
    Clauses clauses = Clauses::kNone;
    // Of the try whose clauses may come.
    bool has_except = false;
    bool has_except_star = false;
    uint32_t head_row = kNoRow;
    uint32_t bare_except = kNoRow;  // of that try
    // Of a match: the number of the case that leaves nothing to those behind it.
    uint32_t irrefutable = kNoRow;
  };

  // Goes over rows that are one more plain statement, head, clause or decorator in its place, as most are, and gives
  // the first one from `index` on that is not: it goes to Next.
  size_t GoOn(size_t index);
  static bool TakesHandler(const LineRow& row, uint32_t index, const Token* toks, Block& block);
  void Next(size_t index);
  void End();
  // Gives the row the place that was found for it.
  void Place(size_t index);
  // What no grammar sees belongs to no block, and ends definitions by its indentation all the same.
  void PassOver(size_t index);
  // The first row from `index` on that the grammar rejected, or how many rows there are; asked in order, as the other.
  size_t NextRejected(size_t index);
  const Irrefutable* IrrefutableAt(size_t index);
  void Indent(size_t index, const LineRow& row);
  void Dedent(size_t index, const LineRow& row, uint32_t column, uint32_t narrow_column);
  void Push(size_t index, uint32_t column, uint32_t narrow_column, Head head, Clauses clauses);
  void ContinueLine(size_t index, const LineRow& row);
  void Clause(size_t index, const LineRow& row, bool was_rejected);
  void Except(size_t index, const LineRow& row, Block& block);
  void Case(size_t index, bool was_rejected, Block& block);
  void Decorator(size_t index, const LineRow& row);
  void Jump(size_t index, const LineRow& row, size_t token);
  // Of a head, with the blocks around it.
  void CheckNesting(size_t index);
  int NestingOf(size_t index) const;
  void FutureImport(size_t index, const LineRow& row);
  void Add(size_t row, Context place, std::string message, bool comes_first = true,
           SyntaxError::Kind kind = SyntaxError::Kind::kSyntax);
  Context FirstToken(const LineRow& row) const;
  // "'if' statement on line 3", for the head that waits for its block.
  std::string NameOfHead() const;
  Head HeadOf(const LineRow& row) const;
  TokenSpan TokensOf(const LineRow& row) const;
  // The width of the indentation with tabs one wide.
  uint32_t NarrowColumn(const LineRow& row) const {
    const auto width =
        source_->tokens[row.first_token].text - (source_->begin() + source_->line_starts[row.first_line]);
    return width == static_cast<ptrdiff_t>(row.indent) ? row.indent : CountNarrowColumn(row);
  }
  uint32_t CountNarrowColumn(const LineRow& row) const;
  void SetWatch(Watch watch, bool is_set) { watch_ = static_cast<uint8_t>(is_set ? watch_ | watch : watch_ & ~watch); }
  bool Watches(Watch watch) const { return (watch_ & watch) != 0; }

  const SourceText* source_ = nullptr;
  std::span<const LineRow> rows_;
  Version version_;
  std::vector<Block> blocks_;
  LineResult* places_ = nullptr;             // a row each
  LinePlace next_place_;                     // of what comes next, unless it ends a block
  std::optional<LinePlace> outside_inline_;  // the same behind this line, which holds the body of a definition
  std::vector<Head> inline_;                 // heads whose bodies are on the line under way
  uint32_t head_index_ = kNoRow;             // the head that waits for its block
  Head head_ = Head::kPlain;                 // what it is to that
  uint32_t last_index_ = kNoRow;             // the statement before
  uint32_t told_row_ = kNoRow;               // the last one of which something was told
  uint8_t watch_ = 0;
  bool has_async_definitions_ = false;
  std::vector<uint32_t> imports_;
  std::vector<uint32_t> declarations_;
  const Readings* readings_ = nullptr;
  size_t next_rejected_ = 0;     // of readings_
  size_t next_irrefutable_ = 0;  // likewise
  std::vector<Finding> findings_;
};

}  // namespace quillet
