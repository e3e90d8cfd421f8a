// Rows and statements: which scope each row stands in, and what the form of a statement says about the
// names in it.
//
// A row may hold several statements, a head and its body; they are taken one after the other by their
// first word alone, so that what stands where it may not is read all the same.
#include <algorithm>

#include "lines/future_imports.h"
#include "lines/string_hints.h"
#include "lines/token_search.h"
#include "lines/type_comment.h"
#include "names/reader.h"
#include "tokens/token_ends.h"

namespace quillet {

NameReader::NameReader(Version version, SymbolTable& symbols, Bindings& out)
    : version_(version), is_python2_(!version.AtLeast(3, 0)), symbols_(symbols), texts_(symbols.texts()), out_(out) {
  SetMarks();
}

void NameReader::SetMarks() {
  marks_.fill(Mark::kOperator);
  marks_[tok::NAME] = Mark::kName;
  marks_[tok::NUMBER] = marks_[tok::ELLIPSIS] = Mark::kConstant;
  marks_[tok::STRING] = Mark::kString;
  marks_[tok::LPAR] = marks_[tok::LSQB] = marks_[tok::LBRACE] = Mark::kOpen;
  marks_[tok::RPAR] = marks_[tok::RSQB] = marks_[tok::RBRACE] = Mark::kClose;
  marks_[tok::DOT] = Mark::kDot;
  marks_[tok::COMMA] = Mark::kComma;
  marks_[tok::COLON] = Mark::kColon;
  marks_[tok::EQUAL] = Mark::kEqual;
  for (int code = tok::PLUSEQUAL; code <= tok::DOUBLESTAREQUAL; ++code) marks_[code] = Mark::kAssign;
  marks_[tok::DOUBLESLASHEQUAL] = marks_[tok::ATEQUAL] = Mark::kAssign;
  marks_[tok::DOUBLESTAR] = Mark::kDoubleStar;
  marks_[tok::BACKQUOTE] = Mark::kBackquote;
  marks_[tok::COMMENT] = marks_[tok::BACKSLASH] = Mark::kSkip;

  for (const TokenCode code : {word::kCase, word::kCast, word::kMatch, word::kType, word::kUnderscore})
    marks_[code] = Mark::kName;
  marks_[word::kLambda] = Mark::kLambda;
  marks_[word::kFor] = Mark::kFor;
  marks_[word::kIn] = Mark::kIn;
  marks_[word::kIf] = Mark::kIf;
  marks_[word::kAs] = Mark::kAs;
  marks_[word::kDef] = marks_[word::kClass] = Mark::kDefinition;
  for (const TokenCode code : {word::kNone, word::kTrue, word::kFalse})
    marks_[code] = is_python2_ ? Mark::kName : Mark::kConstant;
  for (const TokenCode code : {word::kExec, word::kPrint}) marks_[code] = is_python2_ ? Mark::kOperator : Mark::kName;
  if (is_python2_) marks_[word::kNonlocal] = Mark::kName;
  if (!version_.AtLeast(3, 5)) {
    marks_[word::kAsync] = marks_[word::kAwait] = Mark::kName;
  } else if (!version_.AtLeast(3, 7)) {
    marks_[word::kAsync] = Mark::kAsync;
    marks_[word::kAwait] = Mark::kAwait;
  }
}

// ---- rows ----

void NameReader::Read(const SourceText& source, std::span<const LineRow> rows) {
  begin_ = source.begin();
  template_budget_ = 8 * source.size() + 4096;
  last_end_ = 0;
  has_future_annotations_ = false;
  if (is_python2_) marks_[word::kPrint] = ImportsPrintFunction(source, rows) ? Mark::kName : Mark::kOperator;
  symbols_.Open({NameScopeKind::kModule, kNoIndex, kNoIndex, 0, true});
  open_.assign(1, {0, 0, false, false, false});
  frames_.clear();
  candidates_.clear();
  comprehensions_.clear();
  out_.occurrences.reserve(source.tokens.size() / 2);
  tokens_ = source.tokens;
  pieces_.Begin(source);
  for (const LineRow& row : rows) {
    if (row.kind == LineKind::kBlankLine) continue;
    const std::span<const LineRow> pieces = pieces_.Of(row);
    for (const LineRow& piece : pieces) ReadRow(piece);
    if (pieces.empty()) ReadRow(row);
  }
  while (open_.size() > 1) CloseScope();
  EndOfScope(0, static_cast<uint32_t>(source.size()));
}

void NameReader::ReadRow(const LineRow& row) {
  CloseScopes(row);
  row_ = &row;
  at_ = tokens_.data() + row.first_token;
  end_ = at_ + row.token_count;
  embeds_ = !row.no_embedded;
  if (row.kind == LineKind::kComment) return CommentRow();
  Row();
  last_end_ = OffsetOf(end_[-1]) + end_[-1].length;
}

void NameReader::CloseScopes(const LineRow& row) {
  if (row.continues_physical_line) return;
  const bool is_comment = row.kind == LineKind::kComment;
  while (open_.size() > 1) {
    const OpenScope& scope = open_.back();
    if (!scope.is_inline && (is_comment || scope.indent < row.indent)) break;
    CloseScope();
  }
}

void NameReader::CloseScope() {
  const uint32_t scope = open_.back().scope;
  EndOfScope(scope, last_end_);
  const uint32_t around = symbols_[scope].parent;
  if (symbols_[around].kind == NameScopeKind::kTypeParameters) EndOfScope(around, last_end_);
  open_.pop_back();
}

void NameReader::Row() {
  scope_ = statement_scope_ = open_.back().scope;
  quiet_ = kNoIndex;
  flags_ = 0;
  open_.back().awaits_first = false;
  hints_ = {};
  const TokenSpan tokens(at_, end_);
  if (embeds_) {
    bool may_hold_hints = false;
    bool has_plain_string = false;
    for (const Token& token : tokens) {
      may_hold_hints |= token.code == tok::COLON || token.code == tok::RARROW || token.code == word::kCast;
      has_plain_string |= token.code == tok::STRING && !IsFormattedString(token);
    }
    if (may_hold_hints && has_plain_string) {
      row_hints_.clear();
      FindStringHints(tokens, row_hints_);
      hints_ = row_hints_;
      hints_begin_ = at_;
    }
  }
  LineKind kind = row_->kind;
  while (at_ < end_) {
    Statement(kind);
    kind = LineKind::kUnknown;
  }
  if (knows_comprehensions_) {
    knows_comprehensions_ = false;
    comprehensions_.clear();
    next_comprehension_ = 0;
  }
}

// A signature on a line of its own, in front of the first statement of a function's body.
void NameReader::CommentRow() {
  const OpenScope& around = open_.back();
  if (!embeds_ || !around.is_function || !around.awaits_first) return;
  const Text comment = at_->view();
  const TypeCommentHint found = FindTypeCommentHint(comment);
  if (!found.found) return;
  const Text hint = comment.substr(found.begin, found.end - found.begin);
  const size_t first = hint.find_first_not_of(" \t");
  if (first == Text::npos || hint[first] != '(' || hint.find("->") == Text::npos) return;
  scope_ = symbols_[around.scope].parent;
  Hint(hint, kNameComment | kNameAnnotation);
}

// ---- statements ----

void NameReader::Statement(LineKind kind) {
  SkipComments();
  if (at_ >= end_) return;
  statement_begin_ = at_;
  bool is_async = false;
  if (at_->code == word::kAsync) {
    const TokenCode next = NextCode();
    if (next == word::kDef || next == word::kFor || next == word::kWith) {
      is_async = true;
      Step();
    }
  }
  switch (at_->code) {
    case word::kDef:
      return Definition(Head::Kind::kFunction, is_async);
    case word::kClass:
      return Definition(Head::Kind::kClass, false);
    case word::kFor:
      return ForHead();
    case word::kExcept:
      return ExceptHead();
    case word::kElif:
    case word::kElse:
    case word::kFinally:
    case word::kIf:
    case word::kTry:
    case word::kWhile:
    case word::kWith:
      return Expression(true);
    case word::kAssert:
    case word::kBreak:
    case word::kContinue:
    case word::kPass:
    case word::kRaise:
    case word::kReturn:
      return Expression(false);
    case word::kDel:
      return Delete();
    case word::kImport:
      return Import();
    case word::kFrom:
      return FromImport();
    case word::kGlobal:
      return Declaration(NameSymbol::kGlobalStatement);
    case word::kNonlocal:
      if (is_python2_) break;
      return Declaration(NameSymbol::kNonlocalStatement);
    case word::kExec:
    case word::kPrint:
      if (marks_[at_->code] == Mark::kName) break;
      return Expression(false);
    case word::kMatch:
      if (kind != LineKind::kMatch) break;
      return Expression(true);
    case word::kCase:
      if (kind != LineKind::kCase) break;
      return CaseHead();
    case word::kType:
      if (kind != LineKind::kTypeStatement && !IsTypeAlias()) break;
      return TypeAlias();
    case tok::AT:
      return Decorator();
    default:
      break;
  }
  SimpleStatement();
}

void NameReader::Expression(bool is_head) {
  Step();
  BeginBase();
  ReadTokens(is_head);
  EndBase();
  if (is_head) EndColon();
}

void NameReader::EndColon() {
  if (CodeAt() == tok::COLON) ++at_;
}

void NameReader::SimpleStatement() {
  BeginBase();
  frames_.back().is_statement = true;
  frames_.back().collects = true;
  ReadTokens(false);
  EndBase();
  EndVariableAnnotation(false);
}

void NameReader::ForHead() {
  Step();
  BeginBase();
  frames_.back().part = Frame::Part::kTarget;
  frames_.back().collects = true;
  ReadTokens(true);
  EndBase();
  EndColon();
}

void NameReader::ExceptHead() {
  Step();
  BeginBase();
  frames_.back().comma_is_as = is_python2_;
  ReadTokens(true);
  EndBase();
  EndColon();
}

void NameReader::Decorator() {
  Step();
  BeginBase();
  frames_.back().position = kNameDecorator;
  ReadTokens(false);
  EndBase();
}

void NameReader::Delete() {
  Step();
  BeginBase();
  frames_.back().collects = true;
  ReadTokens(false);
  if (frames_.size() == base_ + 1) MakeWrites(frames_.back().candidates, NameRole::kDelete, 0);
  EndBase();
}

// `global` or `nonlocal`, for the whole scope wherever it stands.
void NameReader::Declaration(uint16_t use) {
  Step();
  while (IsName(at_)) {
    const uint32_t text = NumberOf(*at_);
    const uint32_t index = AddBound(*at_, text, NameRole::kDeclaration, NameKind::kNone, use, scope_);
    if (use == NameSymbol::kGlobalStatement && scope_ != 0) {
      const uint32_t name = symbols_.symbol(out_.occurrences[index].place).name;
      symbols_.symbol(symbols_.SymbolNamed(0, name)).uses |= use;
    }
    Step();
    if (CodeAt() != tok::COMMA && !IsName(at_)) break;
    if (CodeAt() == tok::COMMA) Step();
  }
  // Nothing follows but in broken code.
  if (at_ < end_) {
    BeginBase();
    ReadTokens(false);
    EndBase();
  }
}

// ---- imports ----

void NameReader::Import() {
  Step();
  while (at_ < end_) {
    if (!IsName(at_)) {
      Step();
      continue;
    }
    // What a path binds is its first name, or the one behind "as".
    const Token* behind = at_;
    while (true) {
      behind = Next(behind);
      if (behind >= end_ || behind->code != tok::DOT) break;
      behind = Next(behind);
      if (!IsName(behind)) break;
    }
    const bool has_alias = behind < end_ && behind->code == word::kAs;
    const uint32_t text = NumberOf(*at_);
    uint32_t segment = has_alias
                           ? AddWithoutSymbol(*at_, text, NameRole::kImport)
                           : AddBound(*at_, text, NameRole::kImport, NameKind::kImport, NameSymbol::kImported, scope_);
    for (Step(); CodeAt() == tok::DOT;) {
      Step();
      if (!IsName(at_)) break;
      segment = AddAttribute(*at_, NumberOf(*at_), NameRole::kImport, flags_, segment);
      Step();
    }
    ImportAlias();
  }
}

// The name behind an "as" at at_, if there is one.
void NameReader::ImportAlias() {
  if (CodeAt() != word::kAs) return;
  Step();
  if (!IsName(at_)) return;
  AddBound(*at_, NumberOf(*at_), NameRole::kDefinition, NameKind::kImport, NameSymbol::kImported, scope_);
  Step();
}

void NameReader::FromImport() {
  Step();
  uint32_t segment = kNoIndex;
  bool is_behind_dot = false;
  Text module;
  for (; at_ < end_ && at_->code != word::kImport; Step()) {
    if (IsName(at_)) {
      const uint32_t text = NumberOf(*at_);
      module = segment == kNoIndex && !is_behind_dot ? at_->view() : Text();
      segment = segment != kNoIndex && is_behind_dot ? AddAttribute(*at_, text, NameRole::kImport, flags_, segment)
                                                     : AddWithoutSymbol(*at_, text, NameRole::kImport);
    }
    is_behind_dot = at_->code == tok::DOT || at_->code == tok::ELLIPSIS;
  }
  if (at_ >= end_) return;
  for (Step(); at_ < end_;) {
    if (at_->code == tok::STAR) symbols_[scope_].has_star_import = true;
    if (!IsName(at_)) {
      Step();
      continue;
    }
    const uint32_t text = NumberOf(*at_);
    if (module == "__future__" && at_->view() == "annotations") has_future_annotations_ = true;
    const TokenCode next = NextCode();
    if (next == word::kAs)
      AddWithoutSymbol(*at_, text, NameRole::kImport);
    else
      AddBound(*at_, text, NameRole::kImport, NameKind::kImport, NameSymbol::kImported, scope_);
    Step();
    ImportAlias();
  }
}

// ---- patterns ----

// `case pattern if guard:`. A name alone is bound, one with a dot is read, "_" is none at all.
void NameReader::CaseHead() {
  Step();
  pattern_.clear();
  uint32_t receiver = kNoIndex;
  bool is_behind_dot = false;
  bool is_behind_name = false;
  bool has_guard = false;
  for (; at_ < end_; Step()) {
    const TokenCode code = at_->code;
    if (IsName(at_)) {
      const uint32_t text = NumberOf(*at_);
      const TokenCode next = NextCode();
      const bool is_argument = !pattern_.empty() && pattern_.back() == kClassPattern;
      if (is_behind_dot) {
        receiver = AddAttribute(*at_, text, NameRole::kRead, flags_, receiver);
      } else if (next == tok::DOT || next == tok::LPAR ||
                 (next == tok::COLON && !pattern_.empty() && pattern_.back() == tok::LBRACE)) {
        const uint32_t symbol = symbols_.SymbolOf(scope_, text);
        receiver = Add(*at_, text, NameRole::kRead, NameKind::kNone, flags_, symbol);
        MarkRead(symbol, text);
      } else if (is_argument && next == tok::EQUAL) {
        AddWithoutSymbol(*at_, text, NameRole::kKeyword);
      } else if (code != word::kUnderscore) {
        AddBound(*at_, text, NameRole::kWrite, NameKind::kVariable, NameSymbol::kBound, scope_);
      }
      is_behind_dot = false;
      is_behind_name = true;
      continue;
    }
    if (IsOpeningBracket(code)) {
      pattern_.push_back(code == tok::LPAR && is_behind_name ? kClassPattern : code);
    } else if (IsClosingBracket(code)) {
      if (!pattern_.empty()) pattern_.pop_back();
    } else if (pattern_.empty() && (code == tok::COLON || code == word::kIf)) {
      has_guard = code == word::kIf;
      break;
    }
    is_behind_dot = code == tok::DOT;
    is_behind_name = false;
  }
  if (has_guard) return Expression(true);
  EndColon();
}

// ---- definitions ----

void NameReader::Definition(Head::Kind kind, bool is_async) {
  head_ = Head();
  head_.kind = kind;
  head_.is_async = is_async;
  head_.begin = OffsetOf(*statement_begin_);
  head_.outer = scope_;
  Step();
  if (IsName(at_)) {
    const bool is_class = kind == Head::Kind::kClass;
    head_.name = NumberOf(*at_);
    AddNamespace(is_class ? NameKind::kClass : NameKind::kFunction);
    Step();
  }
  BeginBase();
  front_ = Front::kValue;
  const TokenCode code = CodeAt();
  if (kind == Head::Kind::kFunction && code != tok::LPAR && code != tok::LSQB && code != tok::COLON) {
    // Without parentheses, what follows is most likely meant to be in them.
    frames_.back().names = Frame::Names::kParameters;
    frames_.back().inner = BodyScope();
  }
  ReadTokens(true);
  EndBase();
  EndOfHead();
}

// The name of a definition at at_, which is the head's.
void NameReader::AddNamespace(NameKind kind) {
  const uint32_t index = AddBound(*at_, head_.name, NameRole::kDefinition, kind, NameSymbol::kBound, scope_);
  const uint32_t symbol = out_.occurrences[index].place;
  // The scope keeps the name as it is spelled, which a mangled symbol does not have.
  const bool is_private = (texts_[head_.name].form & TextTable::kPrivate) != 0;
  if (!is_private || symbols_.symbol(symbol).name == head_.name) Use(symbol, NameSymbol::kNamespace);
}

uint32_t NameReader::BodyScope() {
  if (head_.body != kNoIndex) return head_.body;
  const bool is_class = head_.kind == Head::Kind::kClass;
  head_.body = symbols_.Open({.kind = is_class ? NameScopeKind::kClass : NameScopeKind::kFunction,
                              .parent = head_.type_scope != kNoIndex ? head_.type_scope : head_.outer,
                              .name = head_.name,
                              .begin = head_.begin,
                              .is_listed = true,
                              .is_async = head_.is_async,
                              .is_private = is_class && head_.name != kNoIndex});
  return head_.body;
}

void NameReader::EndOfHead() {
  const uint32_t body = BodyScope();
  const bool has_colon = CodeAt() == tok::COLON;
  EndColon();
  const bool is_of_row = row_->kind == LineKind::kFunctionDef || row_->kind == LineKind::kClassDef;
  // One in the middle of a row opens its scope for the rest of that row, and for the rows behind it where
  // the rest is empty.
  if (is_of_row || (has_colon && at_ >= end_))
    open_.push_back({body, row_->indent, head_.kind == Head::Kind::kFunction, row_->has_inline_body, true});
  else
    EndOfScope(body, OffsetOf(end_[-1]) + end_[-1].length);
  scope_ = body;
  head_ = Head();
}

bool NameReader::OpenInHead(TokenCode code) {
  if (head_.has_arguments || head_.annotation_scope != kNoIndex) return false;
  Frame frame;
  frame.flags = flags_;
  frame.quiet = quiet_;
  frame.candidates = frame.target = static_cast<uint32_t>(candidates_.size());
  if (code == tok::LSQB && head_.type_scope == kNoIndex && head_.body == kNoIndex) {
    const bool is_class = head_.kind == Head::Kind::kClass;
    head_.type_scope = symbols_.Open({.kind = NameScopeKind::kTypeParameters,
                                      .parent = head_.outer,
                                      .name = head_.name,
                                      .begin = head_.begin,
                                      .is_listed = true,
                                      .sees_class = out_.scopes[head_.outer].kind == NameScopeKind::kClass,
                                      .is_private = is_class && head_.name != kNoIndex});
    frame.kind = Frame::Kind::kTypeParameters;
    frame.names = Frame::Names::kTypeParameters;
    frame.inner = scope_ = head_.type_scope;
    // Bases are evaluated in the scope of the type parameters, defaults around it.
    frame.outer = is_class ? head_.type_scope : head_.outer;
  } else if (code == tok::LPAR && head_.kind == Head::Kind::kFunction) {
    head_.has_arguments = true;
    frames_.back().names = Frame::Names::kValues;
    frame.kind = Frame::Kind::kParameters;
    frame.names = Frame::Names::kParameters;
    frame.inner = BodyScope();
    frame.outer = scope_;
  } else if (code == tok::LPAR && head_.kind == Head::Kind::kClass) {
    head_.has_arguments = true;
    frame.kind = Frame::Kind::kBases;
    frame.names = Frame::Names::kArguments;
    frame.position = kNameBase;
    frame.outer = scope_;
  } else {
    return false;
  }
  frames_.push_back(frame);
  front_ = Front::kOperator;
  operand_ = kNoIndex;
  return true;
}

// `type X = ...` or `type X[...] = ...`.
bool NameReader::IsTypeAlias() const {
  const Token* name = Next(at_);
  if (!IsName(name)) return false;
  const Token* behind = Next(name);
  return behind < end_ && (behind->code == tok::EQUAL || behind->code == tok::LSQB);
}

void NameReader::TypeAlias() {
  head_ = Head();
  head_.kind = Head::Kind::kAlias;
  head_.begin = OffsetOf(*at_);
  head_.outer = scope_;
  Step();
  if (IsName(at_)) {
    head_.name = NumberOf(*at_);
    AddNamespace(NameKind::kTypeAlias);
    Step();
  }
  BeginBase();
  front_ = Front::kValue;
  ReadTokens(false);
  EndBase();
  const uint32_t end = OffsetOf(end_[-1]) + end_[-1].length;
  if (head_.type_scope != kNoIndex) EndOfScope(head_.type_scope, end);
  if (head_.annotation_scope != kNoIndex) EndOfScope(head_.annotation_scope, end);
  head_ = Head();
}

}  // namespace quillet
