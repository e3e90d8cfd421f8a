// Rows and the blocks they stand in.
#include <algorithm>

#include "lines/future_imports.h"
#include "lines/string_hints.h"
#include "lines/token_search.h"
#include "lines/type_comment.h"
#include "syntax/reader_impl.h"
#include "tokens/token_ends.h"

namespace quillet {

SyntaxReader::SyntaxReader(Version version) : impl_(std::make_unique<Impl>(version)) {}
SyntaxReader::~SyntaxReader() = default;

void SyntaxReader::Read(const SourceText& source, std::span<const LineRow> rows, FileSyntax& out) {
  impl_->Read(source, rows, out);
}

SyntaxReader::Impl::Impl(Version version) : version_(version), is_python2_(!version.AtLeast(3, 0)) { SetMarks(); }

void SyntaxReader::Impl::SetMarks() {
  for (const TokenCode code : {tok::NAME, TokenCode{word::kAsync}, TokenCode{word::kAwait}, TokenCode{word::kCase},
                               TokenCode{word::kCast}, TokenCode{word::kExec}, TokenCode{word::kMatch},
                               TokenCode{word::kPrint}, TokenCode{word::kType}, TokenCode{word::kUnderscore}})
    marks_[code] = kIsIdentifier | kBeginsOperand;
  if (is_python2_) marks_[word::kNonlocal] = kIsIdentifier | kBeginsOperand;
  for (const TokenCode code :
       {tok::NUMBER, tok::STRING, tok::LPAR, tok::LSQB, tok::LBRACE, tok::BACKQUOTE, tok::ELLIPSIS, tok::STAR,
        tok::DOUBLESTAR, tok::DOT, TokenCode{word::kFalse}, TokenCode{word::kLambda}, TokenCode{word::kNone},
        TokenCode{word::kTrue}, TokenCode{word::kYield}})
    marks_[code] = kBeginsOperand;
  for (const TokenCode code : {tok::PLUS, tok::MINUS, tok::TILDE, TokenCode{word::kNot}})
    marks_[code] = kBeginsOperand | kIsPrefix;
  for (const TokenCode code : {tok::COMMENT, tok::BACKSLASH, tok::REMOVED, tok::ENDMARKER}) marks_[code] = kIsSkipped;

  bindings_[word::kOr] = kOrBinding;
  bindings_[word::kAnd] = kAndBinding;
  for (const TokenCode code : {tok::LESS, tok::GREATER, tok::EQEQUAL, tok::NOTEQUAL, tok::LESSEQUAL, tok::GREATEREQUAL,
                               TokenCode{word::kIs}, TokenCode{word::kIn}, TokenCode{word::kNot}})
    bindings_[code] = kCompareBinding;
  bindings_[tok::VBAR] = kBitOrBinding;
  bindings_[tok::CIRCUMFLEX] = kBitXorBinding;
  bindings_[tok::AMPER] = kBitAndBinding;
  bindings_[tok::LEFTSHIFT] = bindings_[tok::RIGHTSHIFT] = kShiftBinding;
  bindings_[tok::PLUS] = bindings_[tok::MINUS] = kSumBinding;
  for (const TokenCode code : {tok::STAR, tok::SLASH, tok::DOUBLESLASH, tok::PERCENT, tok::AT})
    bindings_[code] = kProductBinding;
  bindings_[tok::DOUBLESTAR] = kPowerBinding;
}

void SyntaxReader::Impl::Read(const SourceText& source, std::span<const LineRow> rows, FileSyntax& out) {
  out.Clear();
  out_ = &out;
  out.source = begin_ = source.begin();
  tokens_ = source.tokens;
  out.exprs.reserve(tokens_.size() * 5 / 8 + 1);
  out.named.reserve(tokens_.size() / 2);
  out.lists.reserve(tokens_.size() * 5 / 8);
  const auto holds_none = [](const LineRow& row) {
    return row.kind == LineKind::kBlankLine || row.kind == LineKind::kComment;
  };
  out.stmts.reserve(rows.size() + 1 - static_cast<size_t>(std::count_if(rows.begin(), rows.end(), holds_none)));
  out.exprs.emplace_back();
  Stmt& module = out.stmts.emplace_back();
  module.end = module.block_end = static_cast<uint32_t>(source.size());
  has_print_statement_ = is_python2_ && !ImportsPrintFunction(source, rows);
  search_budget_ = 8 * source.size() + 4096;
  blocks_.assign(1, {kModuleStmt, 0, false, kModuleStmt, kModuleStmt});
  decorators_.clear();
  scratch_.clear();
  faults_ = 0;
  pieces_.Begin(source);
  for (const LineRow& row : rows) {
    if (row.kind == LineKind::kBlankLine) continue;
    const std::span<const LineRow> pieces = pieces_.Of(row);
    for (const LineRow& piece : pieces) ReadRow(piece);
    if (pieces.empty()) ReadRow(row);
  }
  FlushDecorators();
  while (blocks_.size() > 1) CloseBlock();
  const auto begins_before = [&out](ExprId a, ExprId b) { return out[a].name_begin < out[b].name_begin; };
  if (!std::is_sorted(out.named.begin(), out.named.end(), begins_before))
    std::stable_sort(out.named.begin(), out.named.end(), begins_before);
}

// ---- rows ----

void SyntaxReader::Impl::ReadRow(const LineRow& row) {
  CloseBlocks(row);
  row_ = &row;
  embeds_ = !row.no_embedded;
  if (row.kind == LineKind::kComment) {
    if (embeds_) SignatureRow(row);
    return;
  }
  const TokenSpan tokens = tokens_.subspan(row.first_token, row.token_count);
  comments_.clear();
  next_comment_ = 0;
  if (embeds_) {
    size_t index = 0;
    for (const Token& token : tokens) {
      if ((marks_[token.code] & kIsSkipped) == 0)
        ++index;
      else if (token.code == tok::COMMENT && FindTypeCommentHint(token.view()).found)
        comments_.push_back({index, token});
    }
  }
  place_ = Place();
  Load(tokens, row_tokens_);
  if (embeds_) {
    bool may_hold_hints = false;
    bool has_plain_string = false;
    for (const Token* at = place_.begin; at != place_.end; ++at) {
      may_hold_hints |= at->code == tok::COLON || at->code == tok::RARROW || at->code == word::kCast;
      has_plain_string |= at->code == tok::STRING && !IsFormattedString(*at);
    }
    if (may_hold_hints && has_plain_string) {
      row_hints_.clear();
      FindStringHints({place_.begin, place_.end}, row_hints_);
      place_.hints = row_hints_;
    }
  }
  LineKind kind = row.kind;
  while (!AtEnd()) {
    Statement(kind);
    kind = LineKind::kUnknown;
  }
}

// Frames the tokens that count by two that are none, and stands at the first.
void SyntaxReader::Impl::Load(TokenSpan tokens, std::vector<Token>& framed) {
  if (framed.size() < tokens.size() + 2) framed.resize(tokens.size() + 2);
  Token* at = framed.data();
  *at++ = {tokens.front().text, 0, tok::REMOVED};
  for (const Token& token : tokens) {
    *at = token;
    at += (marks_[token.code] & kIsSkipped) == 0;
  }
  const char* const end = at == framed.data() + 1 ? tokens.front().text : at[-1].end();
  *at = {end, 0, tok::ENDMARKER};
  place_.begin = place_.at = framed.data() + 1;
  place_.end = at;
}

// A signature on a line of its own, in front of the first statement of a function's body.
void SyntaxReader::Impl::SignatureRow(const LineRow& row) {
  const Block& block = blocks_.back();
  if (out_->stmts[block.stmt].kind != StmtKind::kDef || block.last != kModuleStmt) return;
  if (out_->stmts[block.stmt].hint != kNoExpr) return;
  const Token& comment = tokens_[row.first_token];
  const TypeCommentHint found = FindTypeCommentHint(comment.view());
  if (!found.found) return;
  const Text text = comment.view().substr(found.begin, found.end - found.begin);
  const size_t first = text.find_first_not_of(" \t");
  if (first == Text::npos || text[first] != '(' || text.find("->") == Text::npos) return;
  const ExprId hint = Hint(text);
  if (hint == kNoExpr) return;
  out_->stmts[block.stmt].hint = hint;
  out_->stmts[block.stmt].flags |= kHintIsComment;
}

// ---- blocks ----

void SyntaxReader::Impl::CloseBlocks(const LineRow& row) {
  if (row.continues_physical_line) return;
  const bool is_comment = row.kind == LineKind::kComment;
  while (blocks_.size() > 1) {
    const Block& block = blocks_.back();
    if (!block.is_inline && (is_comment || block.indent < row.indent)) break;
    CloseBlock();
  }
}

void SyntaxReader::Impl::CloseBlock() {
  const Block& block = blocks_.back();
  Stmt& stmt = out_->stmts[block.stmt];
  stmt.block_end = stmt.end;
  if (block.last != kModuleStmt) stmt.block_end = std::max(stmt.end, out_->stmts[block.last].block_end);
  blocks_.pop_back();
}

void SyntaxReader::Impl::OpenBlock(StmtId stmt) {
  const StmtKind kind = out_->stmts[stmt].kind;
  const StmtId function = kind == StmtKind::kDef     ? stmt
                          : kind == StmtKind::kClass ? kModuleStmt
                                                     : blocks_.back().function;
  blocks_.push_back({stmt, row_->indent, false, kModuleStmt, function});
}

// A statement of the block under way, with the faults that there were in front of it.
StmtId SyntaxReader::Impl::BeginStatement(StmtKind kind, uint32_t begin) {
  const auto id = static_cast<StmtId>(out_->stmts.size());
  Stmt& added = out_->stmts.emplace_back();
  Block& block = blocks_.back();
  added.kind = kind;
  added.begin = begin;
  added.parent = block.stmt;
  added.previous = block.last;
  if (block.last == kModuleStmt)
    out_->stmts[block.stmt].first_child = id;
  else
    out_->stmts[block.last].next = id;
  block.last = id;
  faults_before_ = faults_;
  return id;
}

void SyntaxReader::Impl::SetExprs(StmtId stmt, size_t mark) {
  Stmt& set = out_->stmts[stmt];
  set.exprs_begin = static_cast<uint32_t>(out_->lists.size());
  set.exprs_count = static_cast<uint32_t>(scratch_.size() - mark);
  out_->lists.insert(out_->lists.end(), scratch_.begin() + static_cast<ptrdiff_t>(mark), scratch_.end());
  scratch_.resize(mark);
  set.end = set.block_end = LastEnd();
  if (faults_ != faults_before_) set.flags |= kStmtIsBroken;
}

// A simple statement, with those on the stack behind `mark` for its expressions.
void SyntaxReader::Impl::FinishStatement(StmtId stmt, size_t mark) {
  SetExprs(stmt, mark);
  if (next_comment_ < comments_.size()) TakeComments(stmt);
  if (AtEnd() || Take(tok::SEMI)) return;
  Fault();
  out_->stmts[stmt].flags |= kStmtIsBroken;
  if (!BeginsStatement()) Broken(false);
}

void SyntaxReader::Impl::GoBack(const Extent& extent) {
  out_->exprs.resize(extent.exprs);
  out_->lists.resize(extent.lists);
  out_->named.resize(extent.named);
  scratch_.resize(extent.scratch);
  faults_ = extent.faults;
}

}  // namespace quillet
