// One step a row: its indentation opens or closes blocks, its first word is a clause or begins something, and its
// last one may be a jump.
#include "analysis/block_rules.h"

#include <algorithm>
#include <utility>

#include "lines/token_search.h"

namespace quillet {

namespace {

constexpr size_t kMostBlocks = 100;  // as deep as the language lets blocks nest, the file itself with them

bool IsHeadKind(LineKind kind) {
  switch (kind) {
    case LineKind::kIfBeginning:
    case LineKind::kElifBeginning:
    case LineKind::kElseBeginning:
    case LineKind::kForBeginning:
    case LineKind::kWhileBeginning:
    case LineKind::kWith:
    case LineKind::kTry:
    case LineKind::kExcept:
    case LineKind::kFinally:
    case LineKind::kFunctionDef:
    case LineKind::kClassDef:
    case LineKind::kMatch:
    case LineKind::kCase:
      return true;
    default:
      return false;
  }
}

bool IsDefinitionKind(LineKind kind) { return kind == LineKind::kFunctionDef || kind == LineKind::kClassDef; }

// The last token that the grammar sees, or the size.
size_t LastSignificant(TokenSpan toks) {
  for (size_t i = toks.size(); i-- > 0;)
    if (!IsSkipCode(toks[i].code)) return i;
  return toks.size();
}

// The "from" of `from __future__ import`, by itself or behind a head, or the size.
size_t FutureImportIn(TokenSpan toks) {
  for (size_t i = 0; i + 1 < toks.size(); ++i)
    if (toks[i].code == word::kFrom && toks[i + 1].view() == "__future__" && (i == 0 || toks[i - 1].code == tok::COLON))
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

void BlockRules::Reset(const SourceText& source, Version version) {
  source_ = &source;
  version_ = version;
  blocks_.clear();
  blocks_.push_back({0, 0, Head::kFile});
  inline_.clear();
  head_index_ = last_index_ = told_row_ = kNoRow;
  last_was_rejected_ = has_except_star_ = false;
  may_import_future_ = true;
  findings_.clear();
}

void BlockRules::Next(size_t index, const LineRow& row, const Reading& reading) {
  if (row.kind == LineKind::kBlankLine || row.kind == LineKind::kComment) return;
  const TokenSpan toks = TokensOf(row);
  const size_t last = LastSignificant(toks);
  if (last == toks.size()) return;
  if (row.continues_physical_line) {
    ContinueLine(index, row);
  } else {
    inline_.clear();
    Indent(index, row);
    Clause(index, row, reading);
  }
  const TokenCode code = toks[last].code;
  if (code == word::kBreak || code == word::kContinue) Jump(index, row, last);
  if (has_except_star_) [[unlikely]] {
    for (size_t i = 0; i < toks.size(); ++i)
      if (toks[i].code == word::kReturn) Jump(index, row, i);
  }
  const bool is_on_line_of_head = IsHeadKind(row.kind) && code != tok::COLON;
  if (may_import_future_ || row.kind == LineKind::kFromImport || is_on_line_of_head) FutureImport(index, row);
  if (IsHeadKind(row.kind)) {
    // A definition's body on its line is a row of its own.
    if (code == tok::COLON && !row.has_inline_body) {
      head_index_ = index;
      head_ = row;
    } else {
      inline_.push_back(HeadOf(row));
    }
  }
  last_index_ = index;
  last_ = row;
  last_was_rejected_ = reading.was_rejected;
}

void BlockRules::End() {
  if (last_index_ == kNoRow || last_was_rejected_) return;
  const Context end = Context::Index(static_cast<int32_t>(last_.token_count));
  if (version_.AtLeast(3, 8) && TokensOf(last_).back().code == tok::BACKSLASH)
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

// ---- indentation ----

void BlockRules::Indent(size_t index, const LineRow& row) {
  const uint32_t column = row.indent;
  const uint32_t narrow = NarrowColumn(row);
  const bool may_indent = head_index_ != kNoRow || last_was_rejected_;
  const bool must_indent = head_index_ != kNoRow && !last_was_rejected_;
  const Block& top = blocks_.back();
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
    Push(index, column, narrow, must_indent ? HeadOf(head_) : Head::kUnknown,
         must_indent ? Clauses::kNone : Clauses::kUnknown);
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
  blocks_.push_back({column, narrow_column, head, clauses});
}

void BlockRules::Dedent(size_t index, const LineRow& row, uint32_t column, uint32_t narrow_column) {
  size_t left = blocks_.size();
  while (left > 1 && blocks_[left - 1].column > column) --left;
  const Block& now = blocks_[left - 1];
  const bool fits = now.column == column;
  if (!fits && !last_was_rejected_) {
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
    if (last_was_rejected_) continue;
    if (blocks_.back().clauses == Clauses::kTry)
      Add(index, FirstToken(row), "expected 'except' or 'finally' block");
    else if (blocks_.back().clauses == Clauses::kDecorated)
      Add(index, Context::At({0, 0}), "unexpected unindent", true, SyntaxError::Kind::kIndentation);
  }
  if (!fits) Push(index, column, narrow_column, Head::kUnknown, Clauses::kUnknown);
}

uint32_t BlockRules::NarrowColumn(const LineRow& row) const {
  const char* at = source_->begin() + source_->line_starts[row.first_line];
  const char* const end = TokensOf(row)[0].text;
  if (end - at == static_cast<ptrdiff_t>(row.indent)) [[likely]]
    return row.indent;
  uint32_t column = 0;
  for (; at < end; ++at) column = *at == '\f' ? 0 : column + 1;
  return column;
}

// ---- clauses ----

// A statement behind another one, or behind a head, on the same line: one that holds no others.
void BlockRules::ContinueLine(size_t index, const LineRow& row) {
  Block& block = blocks_.back();
  const TokenCode code = TokensOf(row)[static_cast<size_t>(FirstToken(row).value)].code;
  if (block.clauses == Clauses::kDecorated && inline_.empty()) {
    block.clauses = Clauses::kUnknown;
    // At the ";", which is in no row.
    const char* const begin = source_->begin() + source_->line_starts[row.first_line];
    const char* at = TokensOf(row)[0].text;
    while (at > begin && *at != ';') --at;
    Add(index, Context::At({0, static_cast<int32_t>(at - begin)}), "invalid syntax");
  } else if (IsHeadKind(row.kind) || code == tok::AT) {
    Add(index, FirstToken(row), "invalid syntax");
  }
}

void BlockRules::Clause(size_t index, const LineRow& row, const Reading& reading) {
  Block& block = blocks_.back();
  const Clauses before = block.clauses;
  const auto begin = [&](Clauses next) {
    if (before == Clauses::kTry && !reading.was_rejected)
      Add(index, FirstToken(row), "expected 'except' or 'finally' block");
    else if (before == Clauses::kDecorated && next != Clauses::kDecorated && !IsDefinitionKind(row.kind))
      Add(index, FirstToken(row), "invalid syntax");
    block.clauses = reading.was_rejected ? Clauses::kUnknown : next;
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
  if (block.head == Head::kMatch && row.kind != LineKind::kCase) {
    if (!reading.was_rejected) Add(index, FirstToken(row), "invalid syntax");
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
      begin(Clauses::kElif);
      break;
    case LineKind::kForBeginning:
    case LineKind::kWhileBeginning:
      begin(Clauses::kElse);
      break;
    case LineKind::kTry:
      begin(Clauses::kTry);
      block.has_except = block.has_except_star = false;
      block.bare_except = kNoRow;
      break;
    case LineKind::kCase:
      begin(Clauses::kNone);
      Case(index, reading, block);
      break;
    default: {
      const TokenSpan toks = TokensOf(row);
      const size_t first = NextSignificant(toks, 0, toks.size());
      begin(toks[first].code == tok::AT ? Clauses::kDecorated : Clauses::kNone);
      break;
    }
  }
}

void BlockRules::Except(size_t index, const LineRow& row, Block& block) {
  const TokenSpan toks = TokensOf(row);
  const size_t first = NextSignificant(toks, 0, toks.size());
  const size_t next = NextSignificant(toks, first + 1, toks.size());
  const bool is_star = next < toks.size() && toks[next].code == tok::STAR;
  if (is_star ? block.has_except : block.has_except_star)
    Add(index, FirstToken(row), "cannot have both 'except' and 'except*' on the same 'try'");
  (is_star ? block.has_except_star : block.has_except) = true;
  has_except_star_ |= is_star;
  if (block.bare_except != kNoRow)
    Add(block.bare_except, Context::Index(0), "default 'except:' must be last", /*comes_first=*/false);
  block.bare_except = next < toks.size() && toks[next].code == tok::COLON ? index : kNoRow;
}

void BlockRules::Case(size_t index, const Reading& reading, Block& block) {
  if (block.head != Head::kMatch) {
    // Without a match the word is a name, and what follows is too much.
    if (block.head != Head::kUnknown && !reading.was_rejected) Add(index, Context::Index(1), "invalid syntax");
    return;
  }
  if (block.irrefutable_row != kNoRow) {
    Add(block.irrefutable_row, Context::Index(block.irrefutable_at), std::exchange(block.irrefutable, {}),
        /*comes_first=*/false);
    block.irrefutable_row = kNoRow;
  }
  if (reading.irrefutable.empty()) return;
  block.irrefutable_row = index;
  block.irrefutable_at = reading.irrefutable_at;
  block.irrefutable = reading.irrefutable;
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

void BlockRules::FutureImport(size_t index, const LineRow& row) {
  const TokenSpan toks = TokensOf(row);
  const size_t from = FutureImportIn(toks);
  if (from == toks.size()) {
    const bool is_docstring = last_index_ == kNoRow && row.kind == LineKind::kStringExpression;
    may_import_future_ = may_import_future_ && is_docstring;
    return;
  }
  const auto tell = [&](std::string message) {
    Add(index, Context::Index(static_cast<int32_t>(from)), std::move(message), /*comes_first=*/false);
  };
  if (!may_import_future_ || blocks_.size() > 1 || !inline_.empty() || from != 0)
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
  told_row_ = row;
  findings_.push_back({row, kind, std::move(message), place, comes_first});
}

Context BlockRules::FirstToken(const LineRow& row) const {
  const TokenSpan toks = TokensOf(row);
  return Context::Index(static_cast<int32_t>(NextSignificant(toks, 0, toks.size())));
}

std::string BlockRules::NameOfHead() const {
  const TokenSpan toks = TokensOf(head_);
  size_t first = NextSignificant(toks, 0, toks.size());
  if (head_.is_async) first = NextSignificant(toks, first + 1, toks.size());
  std::string name;
  if (head_.kind == LineKind::kFunctionDef) {
    name = "function definition";
  } else if (head_.kind == LineKind::kClassDef) {
    name = "class definition";
  } else {
    const bool is_star = HeadOf(head_) == Head::kExceptStar;
    name = "'" + std::string(toks[first].view()) + (is_star ? "*" : "") + "' statement";
  }
  return name + " on line " + std::to_string(head_.first_line + 1);
}

BlockRules::Head BlockRules::HeadOf(const LineRow& row) const {
  switch (row.kind) {
    case LineKind::kForBeginning:
    case LineKind::kWhileBeginning:
      return Head::kLoop;
    case LineKind::kFunctionDef:
    case LineKind::kClassDef:
      return Head::kDefinition;
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
      return Head::kPlain;
  }
}

TokenSpan BlockRules::TokensOf(const LineRow& row) const {
  return TokenSpan(source_->tokens).subspan(row.first_token, row.token_count);
}

}  // namespace quillet
