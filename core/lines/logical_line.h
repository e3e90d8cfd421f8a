// A logical line: one statement or statement head as tokens, and what analysis wrote on it.
//
// This is the record that the host's CLogicalLine shows. It borrows its tokens from a SourceText,
// which it or whoever made it keeps alive, and writes its records to a RecordStore: its own, or that of a file, of
// which it then owns a range at the end (lines that share a store are analysed one after another).
// Where a Python subclass overrides an operation, `hooks` dispatches to it; without one every
// operation is direct.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "foundations/errors.h"
#include "lines/records.h"
#include "lines/source_text.h"

namespace quillet {

enum class LineKind : uint8_t {
#define QUILLET_LINE_KIND(identifier, text) k##identifier,
#include "lines/line_kinds.def"
  kOther,  // a text of the host's own
};

// The text of a kind; empty for kOther.
Text TextOfLineKind(LineKind kind);
LineKind LineKindOfText(Text text);

class LogicalLine;
class TypingNames;

// Positions by token index. Either stored one by one (a host gave them) or worked out from where
// the tokens stand in their source, relative to a first line.
class PositionView {
 public:
  PositionView() = default;
  explicit PositionView(std::span<const Position> stored) : stored_(stored.data()), size_(stored.size()) {}
  PositionView(const SourceText* source, TokenSpan toks, int32_t first_line)
      : source_(source), toks_(toks.data()), size_(toks.size()), first_line_(first_line) {}

  size_t size() const { return size_; }
  // `index` must be below size().
  Position operator[](size_t index) const;
  int32_t LineOf(size_t index) const { return (*this)[index].line; }
  // The first `count` positions.
  PositionView First(size_t count) const;
  // Those from `begin` up to, not including, `end`.
  PositionView Slice(size_t begin, size_t end) const;

 private:
  const Position* stored_ = nullptr;
  const SourceText* source_ = nullptr;
  const Token* toks_ = nullptr;
  size_t size_ = 0;
  int32_t first_line_ = 0;
};

// Expressions embedded in a line: f-string fields, stringified and commented hints.
struct EmbeddedLines {
  std::vector<LogicalLine*> lines;
  std::vector<std::unique_ptr<LogicalLine>> owned;
  std::shared_ptr<void> keep_alive;  // of the host's, where it made the lines
};

// The virtual operations of a line, for hosts that override them.
class LineHooks {
 public:
  virtual ~LineHooks() = default;
  virtual int GetTokType(LogicalLine& line, int64_t index) = 0;
  virtual void AppendTypeEquiv(LogicalLine& line, Text name, Text equiv) = 0;
  virtual void AppendArgTypeEquiv(LogicalLine& line, Text name, Text info) = 0;
  virtual void SetParsed(LogicalLine& line, bool parsed) = 0;
  virtual void ClearDerivedInfo(LogicalLine& line) = 0;
  virtual EmbeddedLines GetExpLogicals(LogicalLine& line) = 0;
  // Appends the records of `from` to `to`, pair by pair; the host may have put a list of its own
  // in their place.
  virtual void CopyTypeEquivs(LogicalLine& from, LogicalLine& to) = 0;
  // The host's list of argument records, where it put one of its own; false without one.
  virtual bool GetHostArgRecords(LogicalLine& line, std::vector<std::pair<std::string, std::string>>& pairs) = 0;
  // The host's list of token types, where it put one of its own (-1 for what is no type); false without one.
  virtual bool GetHostTokTypes(LogicalLine& line, std::vector<int32_t>& types) = 0;
};

class LogicalLine {
 public:
  LogicalLine() = default;
  LogicalLine(const LogicalLine&) = delete;
  LogicalLine& operator=(const LogicalLine&) = delete;

  // ---- what the cutter (or the host) sets ----
  SourceText* source = nullptr;  // kept by others, unless the line holds it
  TokenSpan toks;
  LineKind kind = LineKind::kUnknown;
  bool parsed = false;
  // True where no token of the line holds an expression of its own (no f-string, no string that
  // may be a hint): GetExpLogicals is then empty without a look at the tokens.
  bool no_embedded = false;
  int32_t first_line = 0;  // in the coordinates of the enclosing text, from 0
  int32_t token_count = 0;
  LineHooks* hooks = nullptr;

  // Makes it the source, for as long as the line has it. Gives the one that was held before, which tokens and texts
  // that are in use may stand in.
  Ref<SourceText> HoldSource(Ref<SourceText> held) {
    source = held.get();
    return std::exchange(held_source_, std::move(held));
  }

  // Positions of the tokens relative to first_line.
  PositionView positions() const;
  // Positions of the host's own; replaces those worked out from the source. Gives the host's that were
  // there before, which a PositionView may still be on.
  std::vector<Position> SetPositions(std::vector<Position> positions);
  // Back to those worked out from the source.
  void UseSourcePositions();
  bool has_stored_positions() const { return has_stored_positions_; }

  // ---- operations ----
  int GetTokType(int64_t index);
  // Both texts are copied.
  void AppendTypeEquiv(Text name, Text equiv);
  void AppendArgTypeEquiv(Text name, Text info);
  // Texts that already outlive the line's records (source, this store's arena, static): no copy.
  void AppendStableTypeEquiv(Text name, Text equiv) {
    if (hooks) [[unlikely]]
      return hooks->AppendTypeEquiv(*this, name, equiv);
    DirectAppend(name, equiv);
  }
  void AppendStableArgTypeEquiv(Text name, Text info) {
    if (hooks) [[unlikely]]
      return hooks->AppendArgTypeEquiv(*this, name, info);
    DirectAppendArg(name, info);
  }
  void SetParsed(bool value) {
    if (hooks) [[unlikely]]
      return hooks->SetParsed(*this, value);
    parsed = value;
  }
  void ClearDerivedInfo() {
    if (hooks) [[unlikely]]
      return hooks->ClearDerivedInfo(*this);
    DirectClearDerivedInfo();
  }
  EmbeddedLines GetExpLogicals() {
    if (hooks) [[unlikely]]
      return hooks->GetExpLogicals(*this);
    return no_embedded ? EmbeddedLines() : DirectGetExpLogicals();
  }
  // Appends this line's records to `to`.
  void CopyTypeEquivsTo(LogicalLine& to);

  // ---- the same without dispatch, for hooks that end in the built-in behaviour ----
  void DirectAppend(Text name, Text equiv) {
    store().rows.push_back(
        {name.data(), equiv.data(), static_cast<uint32_t>(name.size()), static_cast<uint32_t>(equiv.size())});
    ++row_count_;
  }
  void DirectAppendArg(Text name, Text info) {
    store().arg_rows.push_back(
        {name.data(), info.data(), static_cast<uint32_t>(name.size()), static_cast<uint32_t>(info.size())});
    ++arg_row_count_;
  }
  // Appends `row_at(i)` for each i below `count`.
  template <class Function>
  void DirectAppendRows(size_t count, Function&& row_at) {
    std::vector<Record>& rows = store().rows;
    for (size_t i = 0; i < count; ++i) rows.push_back(row_at(i));
    row_count_ += static_cast<uint32_t>(count);
  }
  void DirectClearDerivedInfo();
  EmbeddedLines DirectGetExpLogicals() const;

  // ---- records ----
  // Rows in order of arrival; empty where nothing was recorded (the host then sees None).
  std::span<const Record> type_equivs() const {
    return store_ ? std::span<const Record>(store_->rows.data() + row_begin_, row_count_) : std::span<const Record>();
  }
  std::span<const Record> arg_type_equivs() const {
    return store_ ? std::span<const Record>(store_->arg_rows.data() + arg_row_begin_, arg_row_count_)
                  : std::span<const Record>();
  }
  // Where text that records refer to may be composed.
  TextArena& texts() { return store().texts; }

  // Makes the line write to the end of a shared store.
  void WriteTo(RecordStore* shared) {
    store_ = shared;
    row_begin_ = static_cast<uint32_t>(shared->rows.size());
    arg_row_begin_ = static_cast<uint32_t>(shared->arg_rows.size());
    row_count_ = arg_row_count_ = 0;
  }

  // Makes the line have rows of a shared store.
  void ReadFrom(RecordStore* shared, uint32_t begin, uint32_t end, uint32_t arg_begin, uint32_t arg_end) {
    store_ = shared;
    row_begin_ = begin;
    row_count_ = end - begin;
    arg_row_begin_ = arg_begin;
    arg_row_count_ = arg_end - arg_begin;
  }

 private:
  RecordStore& store() {
    if (!store_) [[unlikely]]
      MakeOwnStore();
    return *store_;
  }
  void MakeOwnStore();

  RecordStore* store_ = nullptr;
  uint32_t row_begin_ = 0, row_count_ = 0;
  uint32_t arg_row_begin_ = 0, arg_row_count_ = 0;
  bool has_stored_positions_ = false;
  Ref<SourceText> held_source_;
  std::vector<Position> stored_positions_;
  std::unique_ptr<RecordStore> own_store_;
};

// What GetExpLogicals gives, found at once and shown one after the other: a string may hold millions of
// fields, and a line each would be a hundred times their size.
class EmbeddedExpressions {
 public:
  // An embedded expression: its tokens in the common list, and the outer token that holds it.
  struct Found {
    LineKind kind;
    uint32_t begin;
    uint32_t end;
    uint32_t outer;
    bool may_be_text;  // see FindStringHints
  };

  // Of a line with positions of the host's own it holds views, so that no code of the host's may run while
  // it lives.
  // `typing`, where it is known: what the file calls the names of types.
  explicit EmbeddedExpressions(const LogicalLine& line, const TypingNames* typing = nullptr);
  ~EmbeddedExpressions();

  size_t size() const { return found_.size(); }
  bool MayBeText(size_t index) const { return found_[index].may_be_text; }
  // Makes `line`, a fresh one or one that an expression was shown in, the expression of this index.
  void Show(size_t index, LogicalLine& line);

 private:
  class PlacesInToken;

  TokenSpan outer_toks_;
  int32_t first_line_;
  bool has_stored_positions_;
  PositionView outer_positions_;
  Ref<SourceText> inner_;
  std::vector<Found> found_;
  std::unique_ptr<PlacesInToken> places_;
  size_t places_of_ = 0;
};

// TextFromTokens of the host: the source text of a line as its tokens and positions spell it.
// Removed tokens leave blanks.
std::string TextFromTokens(const LogicalLine& line);
std::string TextFromTokens(TokenSpan toks, const PositionView& positions);

// True for a line that opens a scope (def, async def, class).
bool IsScopeStartLogical(const LogicalLine& line);

// kMatch or kCase where the tokens from `start` up to `end` are such a statement, and kUnknown
// otherwise. See soft_keywords.cc for how the two are told from ordinary statements.
LineKind FindMatchOrCaseType(TokenSpan toks, size_t start, size_t end);

}  // namespace quillet
