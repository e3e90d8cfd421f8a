// One step a row: its indentation opens or closes blocks, its first word is a clause or begins something, and its
// last one may be a jump.
#include "analysis/block_rules.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <initializer_list>
#include <utility>

#include "lines/token_search.h"
#include "lines/unusual_tokens.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// So many blocks need no look at how deep the language lets some of them nest.
constexpr size_t kDeepBlocks = 10;
constexpr Text kFuture = "__future__";
constexpr size_t kMostBlocks = 100;  // as deep as the language lets blocks nest, the file itself with them

using Role = BlockRules::Role;
using Head = BlockRules::Head;
using Clauses = BlockRules::Clauses;

struct alignas(uint32_t) FactsOfKind {
  Role role;
  Head head;        // of what stands inside
  Clauses clauses;  // that may come behind it
  bool is_head;
};

constexpr auto kFactsOfKinds = [] {
  std::array<FactsOfKind, static_cast<size_t>(LineKind::kOther) + 1> table{};
  table.fill({Role::kOther, Head::kPlain, Clauses::kNone, false});
  const auto set = [&table](std::initializer_list<LineKind> kinds, Role role, Head head = Head::kPlain,
                            Clauses clauses = Clauses::kNone) {
    for (const LineKind kind : kinds) table[static_cast<size_t>(kind)] = {role, head, clauses, role >= Role::kHead};
  };
  set({LineKind::kBlankLine}, Role::kBlank);
  set({LineKind::kComment}, Role::kComment);
  set({LineKind::kStringExpression, LineKind::kAssignment, LineKind::kPass, LineKind::kRaise, LineKind::kAssert,
       LineKind::kReturn, LineKind::kPrint, LineKind::kDelete, LineKind::kTypeStatement, LineKind::kUnknown},
      Role::kPlain);
  set({LineKind::kImport, LineKind::kFromImport}, Role::kImport);
  set({LineKind::kWith}, Role::kHead);
  set({LineKind::kIfBeginning}, Role::kHead, Head::kPlain, Clauses::kElif);
  set({LineKind::kForBeginning, LineKind::kWhileBeginning}, Role::kHead, Head::kLoop, Clauses::kElse);
  set({LineKind::kTry}, Role::kTry, Head::kPlain, Clauses::kTry);
  set({LineKind::kFunctionDef, LineKind::kClassDef}, Role::kDefinitionHead, Head::kDefinition);
  set({LineKind::kElifBeginning}, Role::kClause, Head::kPlain, Clauses::kElif);
  set({LineKind::kElseBeginning}, Role::kClause);
  set({LineKind::kFinally}, Role::kClause, Head::kFinally);
  set({LineKind::kExcept}, Role::kExcept, Head::kPlain, Clauses::kExcept);
  set({LineKind::kMatch, LineKind::kCase}, Role::kMatch);
  return table;
}();

constexpr const FactsOfKind& FactsOf(const LineRow& row) { return kFactsOfKinds[static_cast<size_t>(row.kind)]; }
constexpr Role RoleOf(LineKind kind) { return kFactsOfKinds[static_cast<size_t>(kind)].role; }
bool IsHeadKind(LineKind kind) { return RoleOf(kind) >= Role::kHead; }

// A place as one number, which is moved as such and not field by field.
using PackedPlace = uint64_t;
static_assert(sizeof(PackedPlace) == sizeof(LinePlace));
inline PackedPlace Pack(const LinePlace& place) {
  PackedPlace packed;
  std::memcpy(&packed, &place, sizeof packed);
  return packed;
}
inline void Unpack(PackedPlace packed, LinePlace& place) {
  std::memcpy(static_cast<void*>(&place), &packed, sizeof packed);
}
constexpr auto kFirstInDef = std::bit_cast<PackedPlace>(LinePlace{.first_in_def = true});

bool IsDefinitionKind(LineKind kind) { return kind == LineKind::kFunctionDef || kind == LineKind::kClassDef; }

// What begins so may be something else than one more statement, and a head that does not end so has its body on its
// line: by whether it is a head. Few are: one look at a table is foreseen where a look at the kind of each is not.
constexpr auto kNeedsLook = [] {
  std::array<std::array<bool, 256>, 2> tables{};
  for (const TokenCode code :
       {TokenCode{word::kBreak}, TokenCode{word::kContinue}, TokenCode{word::kFrom}, TokenCode{word::kGlobal},
        TokenCode{word::kImport}, TokenCode{word::kNonlocal}, tok::AT, tok::COMMENT, tok::BACKSLASH})
    tables[false][code] = true;
  tables[true].fill(true);
  tables[true][tok::COLON] = false;
  return tables;
}();

// Which clauses may come behind a row, by those that might in its place; kWrong where that is no place for it, or not
// certainly one. A match and its cases are none of this.
using ClausesBehind = std::array<Clauses, static_cast<size_t>(Clauses::kWrong)>;
constexpr auto kBehindDecorator = [] {
  ClausesBehind behind;
  behind.fill(Clauses::kDecorated);
  behind[static_cast<size_t>(Clauses::kTry)] = behind[static_cast<size_t>(Clauses::kCase)] = Clauses::kWrong;
  return behind;
}();
constexpr auto kClausesBehind = [] {
  std::array<ClausesBehind, kFactsOfKinds.size()> table{};
  for (size_t kind = 0; kind < table.size(); ++kind) {
    const FactsOfKind& facts = kFactsOfKinds[kind];
    const auto set = [&behind = table[kind]](Clauses before, Clauses clauses) {
      behind[static_cast<size_t>(before)] = clauses;
    };
    table[kind].fill(Clauses::kWrong);
    switch (facts.role) {
      case Role::kClause:
      case Role::kMatch:
        break;
      case Role::kExcept:
        for (const Clauses before : {Clauses::kTry, Clauses::kExcept}) set(before, Clauses::kExcept);
        break;
      default:
        for (const Clauses before :
             {Clauses::kNone, Clauses::kElse, Clauses::kElif, Clauses::kExcept, Clauses::kTryElse, Clauses::kUnknown})
          set(before, facts.clauses);
        if (facts.role == Role::kDefinitionHead) set(Clauses::kDecorated, facts.clauses);
    }
  }
  const auto set = [&table](LineKind kind, Clauses before, Clauses clauses) {
    table[static_cast<size_t>(kind)][static_cast<size_t>(before)] = clauses;
  };
  set(LineKind::kElifBeginning, Clauses::kElif, Clauses::kElif);
  set(LineKind::kElseBeginning, Clauses::kElif, Clauses::kNone);
  set(LineKind::kElseBeginning, Clauses::kElse, Clauses::kNone);
  set(LineKind::kElseBeginning, Clauses::kExcept, Clauses::kTryElse);
  for (const Clauses before : {Clauses::kTry, Clauses::kExcept, Clauses::kTryElse})
    set(LineKind::kFinally, before, Clauses::kNone);
  return table;
}();

// The last token that the grammar sees, or the size.
size_t LastSignificant(TokenSpan toks) {
  for (size_t i = toks.size(); i-- > 0;)
    if (!IsSkipCode(toks[i].code)) return i;
  return toks.size();
}

// The "from" of `from __future__ import`, by itself or behind a head, or the size.
size_t FutureImportIn(TokenSpan toks) {
  for (size_t i = 0; i + 1 < toks.size(); ++i)
    if (toks[i].code == word::kFrom && toks[i + 1].view() == kFuture && (i == 0 || toks[i - 1].code == tok::COLON))
      return i;
  return toks.size();
}

bool IsFutureFeature(Text name, Version version) {
  for (const Text known : {"nested_scopes", "generators", "division", "absolute_import", "with_statement",
                           "print_function", "unicode_literals"})
    if (name == known) return true;
  return (name == "barry_as_FLUFL" && version.AtLeast(3, 1)) || (name == "generator_stop" && version.AtLeast(3, 5)) ||
         (name == "annotations" && version.AtLeast(3, 7));
}

}  // namespace

void BlockRules::Check(const SourceText& source, std::span<const LineRow> rows, Version version,
                       const Readings& readings, std::span<LineResult> places) {
  source_ = &source;
  rows_ = rows;
  version_ = version;
  readings_ = &readings;
  next_rejected_ = next_irrefutable_ = 0;
  places_ = places.data();
  next_place_ = {};
  outside_inline_.reset();
  blocks_.clear();
  blocks_.push_back({0, 0, next_place_, Head::kFile});
  inline_.clear();
  head_index_ = last_index_ = told_row_ = kNoRow;
  watch_ = kFutureImports;
  has_async_definitions_ = false;
  imports_.clear();
  declarations_.clear();
  findings_.clear();
  for (size_t i = GoOn(0); i < rows.size(); i = GoOn(i + 1)) {
    const Role role = RoleOf(rows[i].kind);
    if (role > Role::kComment)
      Next(i);
    else if (role == Role::kComment)
      places_[i].LinePlace::operator=(next_place_);
  }
  End();
}

size_t BlockRules::NextRejected(size_t index) {
  const auto& rejected = readings_->rejected;
  while (next_rejected_ < rejected.size() && rejected[next_rejected_] < index) ++next_rejected_;
  return next_rejected_ < rejected.size() ? rejected[next_rejected_] : rows_.size();
}

const BlockRules::Irrefutable* BlockRules::IrrefutableAt(size_t index) {
  const auto& irrefutable = readings_->irrefutable;
  while (next_irrefutable_ < irrefutable.size() && irrefutable[next_irrefutable_].row < index) ++next_irrefutable_;
  return next_irrefutable_ < irrefutable.size() && irrefutable[next_irrefutable_].row == index
             ? &irrefutable[next_irrefutable_]
             : nullptr;
}

// What is known of the rows so far is kept at hand here, and is that of the object again at the end. Nothing of a row
// counts until it is certain.
size_t BlockRules::GoOn(size_t index) {
  if (outside_inline_ && (index == rows_.size() || !rows_[index].continues_physical_line)) {
    next_place_ = *outside_inline_;
    outside_inline_.reset();
  }
  // Between the cases of a match no statement goes on.
  const bool is_between_cases =
      blocks_.back().clauses == Clauses::kCase || (head_index_ != kNoRow && head_ == Head::kMatch);
  if ((watch_ & ~kHead) != 0 || is_between_cases) return index;
  const Token* const tokens = source_->tokens.data();
  const LineRow* const rows = rows_.data();
  const LineRow* const end = rows + NextRejected(index);
  blocks_.resize(blocks_.size() + kDeepBlocks);
  Block* top = &blocks_.back() - kDeepBlocks;
  const Block* const deepest = blocks_.data() + kDeepBlocks - 1;
  PackedPlace next_place = Pack(next_place_);
  LineResult* place = places_ + index;
  const LineRow* head_row = head_index_ != kNoRow ? rows + head_index_ : nullptr;
  Head head = head_;
  const LineRow* row = rows + index;
  for (; row < end; ++row, ++place) {
    if ((row->unusual & (UnusualTokens::kGoesOn | UnusualTokens::kPlace)) != 0) {
      if ((row->unusual & UnusualTokens::kPlace) != 0) break;
      // Which lines are blank, nothing foresees: no branch.
      Unpack(row->kind == LineKind::kBlankLine ? 0 : next_place, *place);
      continue;
    }
    const FactsOfKind facts = FactsOf(*row);
    const ClausesBehind* behind = &kClausesBehind[static_cast<size_t>(row->kind)];
    const Token* const toks = tokens + row->first_token;
    // The last token of a head, the first one of others.
    const uint32_t telling = (row->token_count - 1) & -uint32_t{facts.is_head};
    if (kNeedsLook[facts.is_head][toks[telling].code]) [[unlikely]] {
      if (facts.role == Role::kImport) {
        if (row->token_count < 2 || toks[1].length == kFuture.size()) break;
      } else {
        // What stands behind a decorator on its line is in no row.
        if (toks->code != tok::AT || row->kind != LineKind::kUnknown || !IsLineEnd(*toks[row->token_count - 1].end()))
          break;
        behind = &kBehindDecorator;
      }
    }

    const uint32_t column = row->indent;
    Block* block = top;
    PackedPlace here = next_place;
    if (head_row != nullptr) {
      if (column <= block->column || block >= deepest) break;
      *++block = {column, column, {}, head};
      Unpack(here & ~kFirstInDef, block->place);
      block->head_row = static_cast<uint32_t>(head_row - rows);
    } else {
      // The first one stands at the margin.
      while (column < block->column && block->clauses < Clauses::kTry) --block;
      if (column != block->column) break;
      here = Pack(block->place);
    }
    const Clauses clauses = (*behind)[static_cast<size_t>(block->clauses)];
    if (clauses == Clauses::kWrong) break;
    if (facts.role >= Role::kTry && !TakesHandler(*row, static_cast<uint32_t>(row - rows), toks, *block)) break;
    block->clauses = clauses;
    top = block;
    head_row = facts.is_head ? row : nullptr;
    head = facts.head;
    Unpack(here, *place);
    next_place = here & ~kFirstInDef;
    if (facts.role == Role::kDefinitionHead) {
      has_async_definitions_ |= row->is_async && row->kind == LineKind::kFunctionDef;
      next_place = Pack(block->place.Within(*row));
    } else if (facts.role == Role::kImport) {
      imports_.push_back(static_cast<uint32_t>(row - rows));
    }
  }
  Unpack(next_place, next_place_);
  blocks_.resize(static_cast<size_t>(top - blocks_.data()) + 1);
  size_t behind_last = static_cast<size_t>(row - rows);
  while (behind_last > index && RoleOf(rows[behind_last - 1].kind) <= Role::kComment) --behind_last;
  if (behind_last > index) {
    inline_.clear();
    last_index_ = static_cast<uint32_t>(behind_last - 1);
  }
  head_index_ = head_row != nullptr ? static_cast<uint32_t>(head_row - rows) : kNoRow;
  head_ = head;
  watch_ = head_row != nullptr ? kHead : 0;
  return static_cast<size_t>(row - rows);
}

// A try, or one of its handlers: whether that stands where it may, by the handlers in front of it.
inline bool BlockRules::TakesHandler(const LineRow& row, uint32_t index, const Token* toks, Block& block) {
  if (row.kind == LineKind::kTry) {
    block.has_except = block.has_except_star = false;
    block.bare_except = kNoRow;
    return true;
  }
  const bool is_bare = row.token_count == 2;
  if (block.has_except_star || block.bare_except != kNoRow || (!is_bare && !IsNameCode(toks[1].code))) return false;
  block.has_except = true;
  if (is_bare) block.bare_except = index;
  return true;
}

void BlockRules::Next(size_t index) {
  const LineRow& row = rows_[index];
  const bool was_rejected = NextRejected(index) == index;
  const TokenSpan toks = TokensOf(row);
  const size_t last = LastSignificant(toks);
  if (last == toks.size()) return PassOver(index);
  if (row.continues_physical_line) {
    ContinueLine(index, row);
  } else {
    inline_.clear();
    Indent(index, row);
    Clause(index, row, was_rejected);
  }
  Place(index);
  if (FactsOf(row).role == Role::kImport) imports_.push_back(static_cast<uint32_t>(index));
  const TokenCode code = toks[last].code;
  if (code == word::kBreak || code == word::kContinue) Jump(index, row, last);
  if (Watches(kStarredExcept)) [[unlikely]] {
    for (size_t i = 0; i < toks.size(); ++i)
      if (toks[i].code == word::kReturn) Jump(index, row, i);
  }
  const bool is_head = IsHeadKind(row.kind);
  const bool is_on_line_of_head = is_head && code != tok::COLON;
  if (Watches(kFutureImports) || row.kind == LineKind::kFromImport || is_on_line_of_head) FutureImport(index, row);
  if (is_head) {
    // A definition's body on its line is a row of its own.
    const Head head = HeadOf(row);
    if (code == tok::COLON && !row.has_inline_body) {
      head_index_ = static_cast<uint32_t>(index);
      head_ = head;
    } else {
      if (blocks_.size() >= kDeepBlocks) CheckNesting(index);
      inline_.push_back(head);
    }
  }
  has_async_definitions_ |= row.is_async && row.kind == LineKind::kFunctionDef;
  if (!is_head || is_on_line_of_head) {
    const auto declares = [](const Token& token) {
      return token.code == word::kGlobal || token.code == word::kNonlocal;
    };
    if (std::ranges::any_of(toks, declares)) declarations_.push_back(static_cast<uint32_t>(index));
  }
  SetWatch(kHead, head_index_ != kNoRow);
  SetWatch(kRejection, was_rejected);
  last_index_ = static_cast<uint32_t>(index);
}

void BlockRules::End() {
  if (last_index_ == kNoRow || Watches(kRejection)) return;
  const LineRow& last = rows_[last_index_];
  const Context end = Context::Index(static_cast<int32_t>(last.token_count));
  if (version_.AtLeast(3, 8) && TokensOf(last).back().code == tok::BACKSLASH)
    return Add(last_index_, end, "unexpected EOF while parsing");
  if (head_index_ != kNoRow) {
    return Add(head_index_, end, "expected an indented block after " + NameOfHead(), true,
               SyntaxError::Kind::kIndentation);
  }
  for (size_t i = blocks_.size(); i-- > 0;) {
    if (blocks_[i].clauses == Clauses::kTry) return Add(last_index_, end, "expected 'except' or 'finally' block");
    if (blocks_[i].clauses == Clauses::kDecorated) return Add(last_index_, end, "invalid syntax");
  }
}

// ---- places ----

void BlockRules::Place(size_t index) {
  const LineRow& row = rows_[index];
  places_[index].LinePlace::operator=(next_place_);
  next_place_.first_in_def = false;
  if (!IsDefinitionKind(row.kind)) return;
  if (!row.has_inline_body)
    outside_inline_.reset();
  else if (!outside_inline_)
    outside_inline_ = next_place_;
  next_place_ = next_place_.Within(row);
}

void BlockRules::PassOver(size_t index) {
  const LineRow& row = rows_[index];
  if (!row.continues_physical_line) {
    const auto ended = std::ranges::find_if(blocks_, [&](const Block& block) { return block.column >= row.indent; });
    if (ended != blocks_.end()) {
      next_place_ = ended->place;
      for (auto block = ended; block != blocks_.end(); ++block) block->place = next_place_;
    }
  }
  Place(index);
}

// ---- indentation ----

void BlockRules::Indent(size_t index, const LineRow& row) {
  const uint32_t column = row.indent;
  const uint32_t narrow = NarrowColumn(row);
  const bool may_indent = head_index_ != kNoRow || Watches(kRejection);
  const bool must_indent = head_index_ != kNoRow && !Watches(kRejection);
  const Block& top = blocks_.back();
  if (column == top.column) next_place_ = top.place;
  if (column > top.column) {
    const bool is_mixed = narrow <= top.narrow_column;
    if (is_mixed && version_.AtLeast(3, 0)) {
      Add(index, Context::At({0, 0}), "inconsistent use of tabs and spaces in indentation", true,
          SyntaxError::Kind::kTab);
    } else if (!may_indent) {
      const auto width = TokensOf(row)[0].text - (source_->begin() + source_->line_starts[row.first_line]);
      Add(index, Context::At({0, static_cast<int32_t>(width) - 1}), "unexpected indent", true,
          SyntaxError::Kind::kIndentation);
    }
    const Head head = must_indent ? head_ : Head::kUnknown;
    Push(index, column, narrow, head,
         !must_indent           ? Clauses::kUnknown
         : head == Head::kMatch ? Clauses::kCase
                                : Clauses::kNone);
  } else {
    if (must_indent) {
      Context place = FirstToken(row);
      if (column < top.column) place = Context::At({0, 0});
      Add(index, place, "expected an indented block after " + NameOfHead(), true, SyntaxError::Kind::kIndentation);
    }
    if (column < top.column) {
      Dedent(index, row, column, narrow);
    } else if (narrow != top.narrow_column && version_.AtLeast(3, 0)) {
      Add(index, Context::At({0, 0}), "inconsistent use of tabs and spaces in indentation", true,
          SyntaxError::Kind::kTab);
    }
  }
  head_index_ = kNoRow;
}

void BlockRules::Push(size_t index, uint32_t column, uint32_t narrow_column, Head head, Clauses clauses) {
  if (blocks_.size() == kMostBlocks) {
    Add(index, Context::At({0, 0}), "too many levels of indentation", true, SyntaxError::Kind::kIndentation);
  }
  if (blocks_.size() >= kDeepBlocks && head != Head::kUnknown) CheckNesting(head_index_);
  blocks_.push_back({column, narrow_column, next_place_, head, clauses});
  blocks_.back().place.first_in_def = false;
  if (head != Head::kUnknown) blocks_.back().head_row = head_index_;
  if (narrow_column != column) SetWatch(kTabs, true);
}

void BlockRules::Dedent(size_t index, const LineRow& row, uint32_t column, uint32_t narrow_column) {
  size_t left = blocks_.size();
  while (left > 1 && blocks_[left - 1].column > column) --left;
  const Block& now = blocks_[left - 1];
  const bool fits = now.column == column;
  next_place_ = fits ? now.place : blocks_[left].place;
  if (!fits && !Watches(kRejection)) {
    const char* const begin = source_->begin() + source_->line_starts[row.first_line];
    const char* end = begin;
    while (end < source_->end() && *end != '\n' && *end != '\r') ++end;
    Add(index, Context::At({0, static_cast<int32_t>(end - begin)}),
        "unindent does not match any outer indentation level", true, SyntaxError::Kind::kIndentation);
  } else if (fits && narrow_column != now.narrow_column && version_.AtLeast(3, 0)) {
    Add(index, Context::At({0, 0}), "inconsistent use of tabs and spaces in indentation", true,
        SyntaxError::Kind::kTab);
  }
  for (; blocks_.size() > left; blocks_.pop_back()) {
    if (Watches(kRejection)) continue;
    if (blocks_.back().clauses == Clauses::kTry)
      Add(index, FirstToken(row), "expected 'except' or 'finally' block");
    else if (blocks_.back().clauses == Clauses::kDecorated)
      Add(index, Context::At({0, 0}), "unexpected unindent", true, SyntaxError::Kind::kIndentation);
  }
  SetWatch(kTabs, std::ranges::any_of(blocks_, [](const Block& block) { return block.narrow_column != block.column; }));
  if (!fits) Push(index, column, narrow_column, Head::kUnknown, Clauses::kUnknown);
}

uint32_t BlockRules::CountNarrowColumn(const LineRow& row) const {
  const char* at = source_->begin() + source_->line_starts[row.first_line];
  const char* const end = TokensOf(row)[0].text;
  uint32_t column = 0;
  for (; at < end; ++at) column = *at == '\f' ? 0 : column + 1;
  return column;
}

// ---- clauses ----

// A statement behind another one, or behind a head, on the same line: one that holds no others.
void BlockRules::ContinueLine(size_t index, const LineRow& row) {
  const TokenCode code = TokensOf(row)[static_cast<size_t>(FirstToken(row).value)].code;
  if (IsHeadKind(row.kind) || code == tok::AT) {
    Add(index, FirstToken(row), "invalid syntax");
  }
}

void BlockRules::Clause(size_t index, const LineRow& row, bool was_rejected) {
  Block& block = blocks_.back();
  const Clauses before = block.clauses;
  const auto begin = [&](Clauses next) {
    if (before == Clauses::kTry && !was_rejected)
      Add(index, FirstToken(row), "expected 'except' or 'finally' block");
    else if (before == Clauses::kDecorated && next != Clauses::kDecorated && !IsDefinitionKind(row.kind))
      Add(index, FirstToken(row), "invalid syntax");
    block.clauses = was_rejected ? Clauses::kUnknown : next;
  };
  const auto go_on = [&](bool is_allowed, Clauses next) {
    if (is_allowed || before == Clauses::kUnknown) {
      block.clauses = next;
      return true;
    }
    Add(index, FirstToken(row), before == Clauses::kTry ? "expected 'except' or 'finally' block" : "invalid syntax");
    block.clauses = Clauses::kUnknown;
    return false;
  };
  if (before == Clauses::kCase) {
    if (row.kind == LineKind::kCase)
      Case(index, was_rejected, block);
    else if (!was_rejected)
      Add(index, FirstToken(row), "invalid syntax");
    return;
  }
  switch (row.kind) {
    case LineKind::kElifBeginning:
      go_on(before == Clauses::kElif, Clauses::kElif);
      break;
    case LineKind::kElseBeginning: {
      const bool is_of_try = before == Clauses::kExcept;
      go_on(is_of_try || before == Clauses::kElse || before == Clauses::kElif, is_of_try ? Clauses::kTryElse
                                                                               : before == Clauses::kUnknown
                                                                                   ? before
                                                                                   : Clauses::kNone);
      break;
    }
    case LineKind::kExcept:
      if (go_on(before == Clauses::kTry || before == Clauses::kExcept, Clauses::kExcept)) Except(index, row, block);
      break;
    case LineKind::kFinally:
      go_on(before == Clauses::kTry || before == Clauses::kExcept || before == Clauses::kTryElse, Clauses::kNone);
      break;
    case LineKind::kIfBeginning:
    case LineKind::kForBeginning:
    case LineKind::kWhileBeginning:
      begin(FactsOf(row).clauses);
      break;
    case LineKind::kTry:
      begin(Clauses::kTry);
      block.has_except = block.has_except_star = false;
      block.bare_except = kNoRow;
      break;
    case LineKind::kCase:
      begin(Clauses::kNone);
      Case(index, was_rejected, block);
      break;
    default: {
      const TokenSpan toks = TokensOf(row);
      const bool is_decorator = toks[NextSignificant(toks, 0, toks.size())].code == tok::AT;
      begin(is_decorator ? Clauses::kDecorated : Clauses::kNone);
      if (is_decorator) Decorator(index, row);
      break;
    }
  }
}

// It ends with its line, and not at a ";" on it, which is in no row.
void BlockRules::Decorator(size_t index, const LineRow& row) {
  const TokenSpan toks = TokensOf(row);
  const char* at = toks[LastSignificant(toks)].end();
  while (at < source_->end() && (*at == ' ' || *at == '\t')) ++at;
  if (at == source_->end() || *at != ';') return;
  const Position place = source_->PositionOf(at);
  blocks_.back().clauses = Clauses::kUnknown;
  Add(index, Context::At({place.line - static_cast<int32_t>(row.first_line), place.col}), "invalid syntax",
      /*comes_first=*/false);
}

void BlockRules::Except(size_t index, const LineRow& row, Block& block) {
  const TokenSpan toks = TokensOf(row);
  const size_t first = NextSignificant(toks, 0, toks.size());
  const size_t next = NextSignificant(toks, first + 1, toks.size());
  const bool is_star = next < toks.size() && toks[next].code == tok::STAR;
  if (is_star ? block.has_except : block.has_except_star)
    Add(index, FirstToken(row), "cannot have both 'except' and 'except*' on the same 'try'");
  (is_star ? block.has_except_star : block.has_except) = true;
  if (is_star) SetWatch(kStarredExcept, true);
  if (block.bare_except != kNoRow)
    Add(block.bare_except, Context::Index(0), "default 'except:' must be last", /*comes_first=*/false);
  block.bare_except = next < toks.size() && toks[next].code == tok::COLON ? static_cast<uint32_t>(index) : kNoRow;
}

void BlockRules::Case(size_t index, bool was_rejected, Block& block) {
  if (block.head != Head::kMatch) {
    // Without a match the word is a name, and what follows is too much.
    if (block.head != Head::kUnknown && !was_rejected) Add(index, Context::Index(1), "invalid syntax");
    return;
  }
  if (block.irrefutable != kNoRow) {
    const Irrefutable& found = readings_->irrefutable[block.irrefutable];
    Add(found.row, Context::Index(found.at), found.words, /*comes_first=*/false);
    block.irrefutable = kNoRow;
  }
  if (const Irrefutable* found = IrrefutableAt(index))
    block.irrefutable = static_cast<uint32_t>(found - readings_->irrefutable.data());
}

// ---- statements in their place ----

// `break`, `continue` or `return`, at a token of the row.
void BlockRules::Jump(size_t index, const LineRow& row, size_t token) {
  const TokenCode code = TokensOf(row)[token].code;
  const bool is_return = code == word::kReturn;
  const auto tell = [&](const char* message) {
    Add(index, Context::Index(static_cast<int32_t>(token)), message, /*comes_first=*/false);
  };
  // Whether that settles it.
  const auto pass = [&](Head head) {
    switch (head) {
      case Head::kLoop:
        return !is_return;
      case Head::kExceptStar:
        tell("'break', 'continue' and 'return' cannot appear in an except* block");
        return true;
      case Head::kFinally:
        if (code != word::kContinue || version_.AtLeast(3, 8)) return false;
        tell("'continue' not supported inside 'finally' clause");
        return true;
      case Head::kDefinition:
      case Head::kFile:
        if (code == word::kBreak) tell("'break' outside loop");
        if (code == word::kContinue) tell("'continue' not properly in loop");
        return true;
      default:
        return false;
    }
  };
  if (IsHeadKind(row.kind) && pass(HeadOf(row))) return;
  for (size_t i = inline_.size(); i-- > 0;)
    if (pass(inline_[i])) return;
  for (size_t i = blocks_.size(); i-- > 0;)
    if (pass(blocks_[i].head)) return;
}

void BlockRules::CheckNesting(size_t index) {
  int around = 0;
  for (size_t i = blocks_.size(); i-- > 0 && blocks_[i].head != Head::kDefinition;)
    if (blocks_[i].head_row != kNoRow) around += NestingOf(blocks_[i].head_row);
  const int most = version_.AtLeast(3, 13) ? 21 : 20;
  if (around <= most && around + NestingOf(index) > most)
    Add(index, FirstToken(rows_[index]), "too many statically nested blocks", /*comes_first=*/false);
}

// For how many blocks of the compiler's a head stands. That a try has both kinds of clauses is not known yet.
int BlockRules::NestingOf(size_t index) const {
  const LineRow& row = rows_[index];
  switch (row.kind) {
    case LineKind::kForBeginning:
    case LineKind::kWhileBeginning:
    case LineKind::kTry:
    case LineKind::kFinally:
      return 1;
    case LineKind::kExcept:
      return version_.AtLeast(3, 9) ? 2 : version_.AtLeast(3, 0) ? 1 : 0;
    case LineKind::kWith: {
      const TokenSpan toks = TokensOf(row);
      int items = 1;
      VisitOwnTokens(toks, 0, toks.size(), [&](size_t i) {
        items += toks[i].code == tok::COMMA;
        return toks[i].code != tok::COLON;
      });
      return items;
    }
    default:
      return 0;
  }
}

void BlockRules::FutureImport(size_t index, const LineRow& row) {
  const TokenSpan toks = TokensOf(row);
  const size_t from = FutureImportIn(toks);
  if (from == toks.size()) {
    const bool is_docstring = last_index_ == kNoRow && row.kind == LineKind::kStringExpression;
    if (!is_docstring) SetWatch(kFutureImports, false);
    return;
  }
  const auto tell = [&](std::string message) {
    Add(index, Context::Index(static_cast<int32_t>(from)), std::move(message), /*comes_first=*/false);
  };
  if (!Watches(kFutureImports) || blocks_.size() > 1 || !inline_.empty() || from != 0)
    return tell("from __future__ imports must occur at the beginning of the file");
  bool is_feature = false;
  for (const Token& token : toks) {
    const TokenCode before = (&token == toks.data()) ? tok::ENDMARKER : (&token - 1)->code;
    is_feature |= before == word::kImport;
    if (!is_feature || (before != word::kImport && before != tok::COMMA && before != tok::LPAR)) continue;
    if (!IsNameCode(token.code) && token.code != tok::STAR) continue;
    if (token.view() == "braces") return tell("not a chance");
    if (!IsFutureFeature(token.view(), version_))
      return tell("future feature " + std::string(token.view()) + " is not defined");
  }
}

// ---- words and places ----

void BlockRules::Add(size_t row, Context place, std::string message, bool comes_first, SyntaxError::Kind kind) {
  // The first thing that is wrong with a row is told.
  if (row == told_row_) return;
  told_row_ = static_cast<uint32_t>(row);
  findings_.push_back({row, kind, std::move(message), place, comes_first});
}

Context BlockRules::FirstToken(const LineRow& row) const {
  const TokenSpan toks = TokensOf(row);
  return Context::Index(static_cast<int32_t>(NextSignificant(toks, 0, toks.size())));
}

std::string BlockRules::NameOfHead() const {
  const LineRow& head = rows_[head_index_];
  const TokenSpan toks = TokensOf(head);
  size_t first = NextSignificant(toks, 0, toks.size());
  if (head.is_async) first = NextSignificant(toks, first + 1, toks.size());
  std::string name;
  if (head.kind == LineKind::kFunctionDef) {
    name = "function definition";
  } else if (head.kind == LineKind::kClassDef) {
    name = "class definition";
  } else {
    const bool is_star = head_ == Head::kExceptStar;
    name = "'" + std::string(toks[first].view()) + (is_star ? "*" : "") + "' statement";
  }
  return name + " on line " + std::to_string(head.first_line + 1);
}

BlockRules::Head BlockRules::HeadOf(const LineRow& row) const {
  switch (row.kind) {
    case LineKind::kFinally:
      return Head::kFinally;
    case LineKind::kMatch:
      return Head::kMatch;
    case LineKind::kExcept: {
      const TokenSpan toks = TokensOf(row);
      const size_t first = NextSignificant(toks, 0, toks.size());
      const size_t next = NextSignificant(toks, first + 1, toks.size());
      return next < toks.size() && toks[next].code == tok::STAR ? Head::kExceptStar : Head::kPlain;
    }
    default:
      return FactsOf(row).head;
  }
}

TokenSpan BlockRules::TokensOf(const LineRow& row) const {
  return TokenSpan(source_->tokens).subspan(row.first_token, row.token_count);
}

}  // namespace quillet
