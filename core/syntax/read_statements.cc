// Statements, by their first word, one after the other as they stand in a row: heads with their bodies on
// the line, and what is left over of a statement as one of its own.
#include <algorithm>

#include "lines/token_search.h"
#include "syntax/reader_impl.h"
#include "tokens/operators.h"

namespace quillet {

void SyntaxReader::Impl::Statement(LineKind kind) {
  const uint32_t begin = Begin();
  const TokenCode next = NextCode();
  const bool is_async = Is(word::kAsync) && (next == word::kDef || next == word::kFor || next == word::kWith);
  const TokenCode code = is_async ? next : Code();
  if (!decorators_.empty() && code != tok::AT && code != word::kDef && code != word::kClass) [[unlikely]]
    FlushDecorators();
  if (is_async) Step();
  switch (code) {
    case word::kDef:
      return Definition(StmtKind::kDef, begin, is_async);
    case word::kClass:
      return Definition(StmtKind::kClass, begin, false);
    case word::kIf:
      return ConditionHead(StmtKind::kIf, true);
    case word::kElif:
      return ConditionHead(StmtKind::kElif, true);
    case word::kWhile:
      return ConditionHead(StmtKind::kWhile, true);
    case word::kElse:
      return ConditionHead(StmtKind::kElse, false);
    case word::kTry:
      return ConditionHead(StmtKind::kTry, false);
    case word::kFinally:
      return ConditionHead(StmtKind::kFinally, false);
    case word::kFor:
      return ForHead(begin, is_async);
    case word::kExcept:
      return ExceptHead();
    case word::kWith:
      return WithHead(begin, is_async);
    case word::kBreak:
    case word::kContinue:
    case word::kPass: {
      const StmtId stmt = BeginStatement(StmtKind::kPass, begin);
      out_->stmts[stmt].op = code;
      Step();
      return FinishStatement(stmt, scratch_.size());
    }
    case word::kReturn:
      return Return();
    case word::kRaise:
      return Raise();
    case word::kAssert:
      return Assert();
    case word::kDel:
      return Delete();
    case word::kImport:
      return Import();
    case word::kFrom:
      return FromImport();
    case word::kGlobal:
      return Declaration(StmtKind::kGlobal);
    case word::kNonlocal:
      if (is_python2_) break;
      return Declaration(StmtKind::kNonlocal);
    case word::kPrint:
      if (!IsPrintStatement()) break;
      return Print();
    case word::kExec:
      if (!IsExecStatement()) break;
      return Exec();
    case word::kMatch:
      if (kind != LineKind::kMatch) break;
      return MatchHead();
    case word::kCase:
      if (kind != LineKind::kCase) break;
      return CaseHead();
    case word::kType:
      if (!IsTypeAlias()) break;
      return TypeAlias();
    case tok::AT:
      return Decorator();
    case tok::SEMI:
      return Step();
    default:
      break;
  }
  if (!BeginsExpression()) return Broken(false);
  SimpleStatement();
}

// An expression or an assignment.
void SyntaxReader::Impl::SimpleStatement() {
  const StmtId stmt = BeginStatement(StmtKind::kExpression, Begin());
  const size_t mark = scratch_.size();
  const ExprId first = Expressions();
  Push(first);
  const TokenCode code = Code();
  if (code == tok::EQUAL) {
    ExprId last = first;
    while (Take(tok::EQUAL)) {
      MarkTarget(last);
      last = Expressions();
      Push(last);
    }
    out_->stmts[stmt].kind = StmtKind::kAssign;
  } else if (code == tok::COLON) {
    Step();
    MarkTarget(first);
    const ExprId hint = Expressions();
    out_->stmts[stmt].hint = hint;
    if (Take(tok::EQUAL)) Push(Expressions());
    out_->stmts[stmt].kind = StmtKind::kAnnotated;
  } else if (IsAssignment(code) && !IsArrow()) {
    out_->stmts[stmt].op = code;
    Step();
    MarkTarget(first);
    Push(Expressions());
    out_->stmts[stmt].kind = StmtKind::kAugmentedAssign;
  }
  FinishStatement(stmt, mark);
}

// Whether a statement of its own may begin in the middle of a row.
bool SyntaxReader::Impl::BeginsStatement() const {
  const TokenCode code = Code();
  if (code == word::kDef || code == word::kClass) return (marks_[NextCode()] & kIsIdentifier) != 0;
  if (code == word::kAsync) return NextCode() == word::kDef || NextCode() == word::kWith;
  return OnlyBeginsStatement(code);
}

// What is left over of a statement, or none: the expressions that are to be found in it. Of a head it ends
// in front of the colon.
void SyntaxReader::Impl::Broken(bool is_head) {
  const StmtId stmt = BeginStatement(StmtKind::kBroken, Begin());
  const size_t mark = scratch_.size();
  Fault();
  do {
    if (BeginsExpression())
      Push(StarExpression());
    else
      Step();
  } while (!AtEnd() && !Is(tok::SEMI) && !BeginsStatement() && !(is_head && Is(tok::COLON)));
  SetExprs(stmt, mark);
  out_->stmts[stmt].flags |= kStmtIsBroken;
  Take(tok::SEMI);
}

// ---- heads ----

// The end of a head, with its expressions on the stack behind `mark`: opens its block.
void SyntaxReader::Impl::EndOfHead(StmtId stmt, size_t mark) {
  SetExprs(stmt, mark);
  const StmtKind kind = out_->stmts[stmt].kind;
  const bool opens_block = blocks_.size() <= kMaxBlocks;
  if (opens_block) OpenBlock(stmt);
  const size_t block = blocks_.size() - 1;
  if (!Is(tok::COLON)) {
    out_->stmts[stmt].flags |= kStmtIsBroken;
    Fault();
    const bool is_bare = kind == StmtKind::kElse || kind == StmtKind::kTry || kind == StmtKind::kFinally;
    if (!AtEnd() && !BeginsStatement() && !(is_bare && (Is(word::kIf) || Is(word::kFor)))) {
      Broken(true);
      // Comments in the middle of it are nobody's.
      while (next_comment_ < comments_.size() && comments_[next_comment_].index <= Index()) ++next_comment_;
    }
  }
  Take(tok::COLON);
  out_->stmts[stmt].end = out_->stmts[stmt].block_end = LastEnd();
  if (next_comment_ < comments_.size()) TakeComments(stmt);
  const bool is_definition = kind == StmtKind::kDef || kind == StmtKind::kClass;
  if (opens_block) blocks_[block].is_inline = !AtEnd() || (is_definition && row_->has_inline_body);
}

void SyntaxReader::Impl::ConditionHead(StmtKind kind, bool has_condition) {
  const StmtId stmt = BeginStatement(kind, Begin());
  const size_t mark = scratch_.size();
  Step();
  if (has_condition) Push(Expressions());
  EndOfHead(stmt, mark);
}

void SyntaxReader::Impl::ForHead(uint32_t begin, bool is_async) {
  const StmtId stmt = BeginStatement(StmtKind::kFor, begin);
  if (is_async) out_->stmts[stmt].flags |= kAsyncStmt;
  const size_t mark = scratch_.size();
  Step();
  Push(Targets());
  Push(Take(word::kIn) ? Expressions() : Missing());
  EndOfHead(stmt, mark);
}

// `except A as b`, `except* A`, `except A, b` of Python 2, and `except A, B` of 3.14.
void SyntaxReader::Impl::ExceptHead() {
  const StmtId stmt = BeginStatement(StmtKind::kExcept, Begin());
  const size_t mark = scratch_.size();
  Step();
  if (Take(tok::STAR)) out_->stmts[stmt].flags |= kExceptGroup;
  if (BeginsExpression()) {
    const uint32_t begin = Begin();
    Push(Expression());
    bool has_trailing_comma = false;
    while (Take(tok::COMMA)) {
      has_trailing_comma = !BeginsExpression();
      if (has_trailing_comma) break;
      Push(Expression());
    }
    const size_t count = scratch_.size() - mark;
    if (count == 2 && !has_trailing_comma && !version_.AtLeast(3, 14) && !Is(word::kAs)) {
      MarkTarget(scratch_.back());
    } else if (count > 1 || has_trailing_comma) {
      const ExprId types = NodeOf(ExprKind::kTuple, begin, mark);
      if (has_trailing_comma) Flag(types, kTrailingComma);
      Push(types);
    }
    if (Take(word::kAs)) Push(Target());
  }
  EndOfHead(stmt, mark);
}

void SyntaxReader::Impl::WithHead(uint32_t begin, bool is_async) {
  const StmtId stmt = BeginStatement(StmtKind::kWith, begin);
  if (is_async) out_->stmts[stmt].flags |= kAsyncStmt;
  const size_t mark = scratch_.size();
  Step();
  do {
    if (!Is(tok::LPAR) || !AreWithItems()) {
      WithItem();
      continue;
    }
    Level level(*this, tok::LPAR);
    if (!Items(tok::RPAR, tok::ENDMARKER, [this] { WithItem(); })) Fault();
  } while (Take(tok::COMMA) && !AtEnd());
  EndOfHead(stmt, mark);
}

void SyntaxReader::Impl::WithItem() {
  const uint32_t begin = Begin();
  const ExprId value = Expression();
  const ExprId target = Take(word::kAs) ? Target() : kNoExpr;
  Push(target != kNoExpr ? Node(ExprKind::kWithItem, begin, {value, target})
                         : Node(ExprKind::kWithItem, begin, {value}));
}

// Whether the bracket at hand holds the items of a `with` and not the first one's value.
bool SyntaxReader::Impl::AreWithItems() {
  size_t depth = 0;
  bool has_comma = false;
  for (const Token* at = place_.at; at != place_.end && search_budget_ > 0; ++at, --search_budget_) {
    const TokenCode code = at->code;
    if (IsOpeningBracket(code)) ++depth;
    if (IsClosingBracket(code) && --depth == 0) {
      return (at[1].code == tok::COLON || at[1].code == tok::ENDMARKER) && (!has_comma || version_.AtLeast(3, 9));
    }
    if (depth != 1) continue;
    if (code == word::kAs) return true;
    if (code == word::kFor || code == word::kYield || code == tok::COLONEQUAL) return false;
    has_comma |= code == tok::COMMA;
  }
  return false;
}

void SyntaxReader::Impl::MatchHead() {
  const StmtId stmt = BeginStatement(StmtKind::kMatch, Begin());
  const size_t mark = scratch_.size();
  Step();
  Push(Expressions());
  EndOfHead(stmt, mark);
}

void SyntaxReader::Impl::CaseHead() {
  const StmtId stmt = BeginStatement(StmtKind::kCase, Begin());
  const size_t mark = scratch_.size();
  Step();
  Push(Patterns());
  if (Take(word::kIf)) Push(Expression());
  EndOfHead(stmt, mark);
}

// ---- simple statements ----

void SyntaxReader::Impl::Return() {
  const StmtId stmt = BeginStatement(StmtKind::kReturn, Begin());
  const size_t mark = scratch_.size();
  Step();
  if (BeginsExpression()) {
    Push(Expressions());
    if (const StmtId function = blocks_.back().function; function != kModuleStmt)
      out_->stmts[function].flags |= kHasReturnValue;
  }
  FinishStatement(stmt, mark);
}

// `raise E from C`, and `raise E, V, T` of Python 2.
void SyntaxReader::Impl::Raise() {
  const StmtId stmt = BeginStatement(StmtKind::kRaise, Begin());
  const size_t mark = scratch_.size();
  Step();
  if (BeginsExpression()) {
    Push(Expression());
    while (Take(tok::COMMA)) Push(Expression());
    if (Take(word::kFrom)) Push(Expression());
  }
  FinishStatement(stmt, mark);
}

void SyntaxReader::Impl::Assert() {
  const StmtId stmt = BeginStatement(StmtKind::kAssert, Begin());
  const size_t mark = scratch_.size();
  Step();
  Push(Expression());
  if (Take(tok::COMMA)) Push(Expression());
  FinishStatement(stmt, mark);
}

void SyntaxReader::Impl::Delete() {
  const StmtId stmt = BeginStatement(StmtKind::kDelete, Begin());
  const size_t mark = scratch_.size();
  Step();
  do {
    if (scratch_.size() > mark && !BeginsExpression()) break;
    Push(Target());
  } while (Take(tok::COMMA));
  FinishStatement(stmt, mark);
}

// Outside of Python 2 only what can be nothing else: somebody's older code.
bool SyntaxReader::Impl::IsPrintStatement() const {
  const TokenCode next = NextCode();
  if (has_print_statement_) return next != tok::EQUAL && next != tok::DOT;
  return next == tok::STRING || next == tok::NAME || next == tok::NUMBER || next == tok::BACKQUOTE;
}

bool SyntaxReader::Impl::IsExecStatement() const {
  const TokenCode next = NextCode();
  if (is_python2_) return next != tok::EQUAL && next != tok::DOT;
  return next == tok::STRING || next == tok::NAME;
}

void SyntaxReader::Impl::Print() {
  const StmtId stmt = BeginStatement(StmtKind::kPrint, Begin());
  const size_t mark = scratch_.size();
  Step();
  Take(tok::RIGHTSHIFT);
  while (BeginsExpression()) {
    Push(Expression());
    if (!Take(tok::COMMA)) break;
  }
  FinishStatement(stmt, mark);
}

void SyntaxReader::Impl::Exec() {
  const StmtId stmt = BeginStatement(StmtKind::kExec, Begin());
  const size_t mark = scratch_.size();
  Step();
  Push(Operators(kBitOrBinding));
  if (Take(word::kIn)) {
    Push(Expression());
    if (Take(tok::COMMA)) Push(Expression());
  }
  FinishStatement(stmt, mark);
}

// `global` or `nonlocal`.
void SyntaxReader::Impl::Declaration(StmtKind kind) {
  const StmtId stmt = BeginStatement(kind, Begin());
  const size_t mark = scratch_.size();
  Step();
  do {
    if (!IsName()) {
      Fault();
      break;
    }
    Push(Name());
  } while (Take(tok::COMMA));
  FinishStatement(stmt, mark);
}

// ---- imports ----

// The dots and names of a module; a name that is missing behind a dot is missing there.
ExprId SyntaxReader::Impl::ModulePath() {
  const uint32_t begin = Begin();
  const size_t mark = scratch_.size();
  uint32_t dots = 0;
  for (; Is(tok::DOT) || Is(tok::ELLIPSIS); Step()) dots += place_.at->length;
  const uint32_t faults = faults_;
  if (IsName()) {
    Push(Name());
    while (Take(tok::DOT)) {
      if (!IsName()) {
        Push(Missing());
        break;
      }
      Push(Name());
    }
  } else if (dots == 0) {
    Fault();
  }
  const ExprId path =
      Add(ExprKind::kModulePath, begin, std::max(begin, LastEnd()), static_cast<uint8_t>(std::min(dots, 255u)));
  TakeChildren(path, mark);
  if (dots == 0 && out_->exprs[path].children_count == 0) out_->exprs[path].begin = out_->exprs[path].end = LastEnd();
  if (faults_ != faults) Flag(path, kIsBroken);
  return path;
}

void SyntaxReader::Impl::Import() {
  const StmtId stmt = BeginStatement(StmtKind::kImport, Begin());
  const size_t mark = scratch_.size();
  Step();
  do {
    const ExprId path = ModulePath();
    const uint32_t begin = out_->exprs[path].begin;
    const ExprId name = Take(word::kAs) ? (IsName() ? Name() : Missing()) : kNoExpr;
    Push(name != kNoExpr ? Node(ExprKind::kImportAlias, begin, {path, name})
                         : Node(ExprKind::kImportAlias, begin, {path}));
  } while (Take(tok::COMMA));
  FinishStatement(stmt, mark);
}

void SyntaxReader::Impl::FromImport() {
  const StmtId stmt = BeginStatement(StmtKind::kFromImport, Begin());
  const size_t mark = scratch_.size();
  Step();
  Push(ModulePath());
  const auto alias = [this] {
    const uint32_t begin = Begin();
    if (Take(tok::STAR)) {
      const ExprId star = Node(ExprKind::kImportAlias, begin, {});
      Flag(star, kIsStar);
      return Push(star);
    }
    if (!IsName()) {
      Fault();
      if (!AtEnd()) Step();
      return;
    }
    const ExprId imported = Name();
    const ExprId name = Take(word::kAs) ? (IsName() ? Name() : Missing()) : kNoExpr;
    Push(name != kNoExpr ? Node(ExprKind::kImportAlias, begin, {imported, name})
                         : Node(ExprKind::kImportAlias, begin, {imported}));
  };
  if (!Take(word::kImport)) {
    Fault();
  } else if (Is(tok::LPAR)) {
    Level level(*this, tok::LPAR);
    if (!Items(tok::RPAR, tok::ENDMARKER, alias)) Fault();
  } else {
    do alias();
    while (Take(tok::COMMA));
  }
  FinishStatement(stmt, mark);
}

// ---- definitions ----

void SyntaxReader::Impl::Decorator() {
  constexpr size_t kMost = UINT16_MAX;
  if (decorators_.size() == kMost) FlushDecorators();
  if (decorators_.empty()) decorators_begin_ = Begin();
  Step();
  decorators_.push_back(Expression());
  if (AtEnd() || BeginsStatement()) return;
  Break(decorators_.back());
  while (!AtEnd() && !BeginsStatement()) Step();
}

// Decorators that no definition follows.
void SyntaxReader::Impl::FlushDecorators() {
  if (decorators_.empty()) return;
  const StmtId stmt = BeginStatement(StmtKind::kBroken, decorators_begin_);
  const size_t mark = scratch_.size();
  scratch_.insert(scratch_.end(), decorators_.begin(), decorators_.end());
  const uint32_t end = out_->exprs[decorators_.back()].end;
  decorators_.clear();
  SetExprs(stmt, mark);
  out_->stmts[stmt].end = out_->stmts[stmt].block_end = end;
  out_->stmts[stmt].flags |= kStmtIsBroken;
}

void SyntaxReader::Impl::Definition(StmtKind kind, uint32_t begin, bool is_async) {
  const StmtId stmt = BeginStatement(kind, begin);
  const size_t mark = scratch_.size();
  if (is_async) out_->stmts[stmt].flags |= kAsyncStmt;
  out_->stmts[stmt].decorator_count = static_cast<uint16_t>(decorators_.size());
  scratch_.insert(scratch_.end(), decorators_.begin(), decorators_.end());
  decorators_.clear();
  Step();
  if (IsName()) {
    out_->stmts[stmt].name_begin = Begin();
    Step();
    out_->stmts[stmt].name_end = LastEnd();
  } else {
    out_->stmts[stmt].name_begin = out_->stmts[stmt].name_end = LastEnd();
    Fault();
  }
  if (Is(tok::LSQB)) {
    const size_t first = scratch_.size();
    TypeParameters();
    out_->stmts[stmt].type_parameter_count =
        static_cast<uint16_t>(std::min<size_t>(scratch_.size() - first, UINT16_MAX));
  }
  last_parameter_ = kNoExpr;
  if (kind == StmtKind::kClass) {
    if (Is(tok::LPAR) && !Arguments()) Fault();
  } else if (Is(tok::LPAR)) {
    bool is_closed;
    {
      Level level(*this, tok::LPAR);
      is_closed = Items(tok::RPAR, tok::SLASH, [this] { Parameter(false); });
    }
    if (!is_closed) Fault();
    EndOfParameters(is_closed ? place_.at - 1 : place_.at);
  } else {
    // Without brackets what follows is most likely meant to be in them.
    while (BeginsExpression() && !BeginsStatement()) {
      Parameter(false);
      Take(tok::COMMA);
    }
  }
  if (IsArrow()) {
    Step();
    const ExprId hint = Expressions();
    out_->stmts[stmt].hint = hint;
  }
  EndOfHead(stmt, mark);
}

void SyntaxReader::Impl::Parameter(bool is_lambda) {
  if (!is_lambda) EndOfParameters(place_.at);
  const uint32_t begin = Begin();
  ParameterKind kind = ParameterKind::kPlain;
  if (Take(tok::STAR))
    kind = ParameterKind::kStar;
  else if (Take(tok::DOUBLESTAR))
    kind = ParameterKind::kDoubleStar;
  else if (Take(tok::SLASH))
    kind = ParameterKind::kSlash;
  const ExprId parameter = Add(ExprKind::kParameter, begin, begin);
  const bool has_name = IsName() && kind != ParameterKind::kSlash;
  if (!has_name) SetNoName(parameter);
  ExprId annotation = kNoExpr, value = kNoExpr, tuple = kNoExpr;
  if (has_name) {
    SetName(parameter, *place_.at);
    Step();
  } else if (kind == ParameterKind::kStar) {
    kind = ParameterKind::kBareStar;
  } else if (kind == ParameterKind::kDoubleStar) {
    Break(parameter);
  } else if (kind == ParameterKind::kPlain && Is(tok::LPAR)) {
    tuple = Target();
  } else if (kind == ParameterKind::kPlain) {
    // No parameter, but something is there.
    value = Expression();
    Break(parameter);
  }
  if (!is_lambda && Take(tok::COLON)) annotation = StarExpression();
  if (Take(tok::EQUAL)) value = Expression();
  out_->exprs[parameter].op = static_cast<uint8_t>(kind);
  EndHere(parameter);
  SetParts(parameter, {annotation, value, tuple});
  Push(parameter);
  if (!is_lambda) last_parameter_ = parameter;
}

// Comments in front of `end` belong to the parameter behind which they stand.
void SyntaxReader::Impl::EndOfParameters(const Token* end) {
  while (next_comment_ < comments_.size() &&
         comments_[next_comment_].index <= static_cast<size_t>(end - place_.begin)) {
    const ExprId hint = CommentHint(comments_[next_comment_++].token);
    if (hint == kNoExpr || last_parameter_ == kNoExpr) continue;
    if (out_->ChildOf(last_parameter_, 0) != kNoExpr) continue;
    SetParts(last_parameter_, {hint, out_->ChildOf(last_parameter_, 1), out_->ChildOf(last_parameter_, 2)});
  }
}

void SyntaxReader::Impl::TypeParameters() {
  Level level(*this, tok::LSQB);
  const auto parameter = [this] {
    const uint32_t begin = Begin();
    const ParameterKind kind = Take(tok::STAR)         ? ParameterKind::kStar
                               : Take(tok::DOUBLESTAR) ? ParameterKind::kDoubleStar
                                                       : ParameterKind::kPlain;
    const ExprId id = Add(ExprKind::kTypeParameter, begin, begin, static_cast<uint8_t>(kind));
    ExprId bound = kNoExpr, value = kNoExpr;
    if (IsName()) {
      SetName(id, *place_.at);
      Step();
    } else {
      SetNoName(id);
      Break(id);
      if (BeginsExpression()) value = StarExpression();
    }
    if (Take(tok::COLON)) bound = Expression();
    if (Take(tok::EQUAL)) value = StarExpression();
    EndHere(id);
    SetParts(id, {bound, value});
    Push(id);
  };
  if (!Items(tok::RSQB, tok::ENDMARKER, parameter)) Fault();
}

// `type X = ...` or `type X[...] = ...`.
bool SyntaxReader::Impl::IsTypeAlias() const {
  if ((marks_[NextCode()] & kIsIdentifier) == 0) return false;
  const TokenCode behind = place_.at[2].code;
  return behind == tok::EQUAL || behind == tok::LSQB;
}

void SyntaxReader::Impl::TypeAlias() {
  const StmtId stmt = BeginStatement(StmtKind::kTypeAlias, Begin());
  const size_t mark = scratch_.size();
  Step();
  out_->stmts[stmt].name_begin = Begin();
  Step();
  out_->stmts[stmt].name_end = LastEnd();
  if (Is(tok::LSQB)) {
    TypeParameters();
    out_->stmts[stmt].type_parameter_count =
        static_cast<uint16_t>(std::min<size_t>(scratch_.size() - mark, UINT16_MAX));
  }
  Push(Take(tok::EQUAL) ? Expressions() : Missing());
  FinishStatement(stmt, mark);
}

}  // namespace quillet
