// Statements and heads of statements.
//
// A head without its body gets the placeholder that the tables use, and so do the parts of a statement that a
// clause of its own lacks: the tree of `else: x` is that of an `if` whose other parts are invented.
#include <algorithm>
#include <utility>

#include "parser/complete_depth.h"
#include "parser/complete_parser.h"

namespace quillet {

namespace {

constexpr Token kCompletePass{"pass", 4, word::kPass};
constexpr Token kCompleteIf{"if", 2, word::kIf};
constexpr Token kCompleteTry{"try", 3, word::kTry};
constexpr Token kCompleteFinally{"finally", 7, word::kFinally};
constexpr Token kCompleteColon{":", 1, tok::COLON};
constexpr Token kCompleteZero{"0", 1, tok::NUMBER};

bool IsAugmentedAssignment(const Token& token) {
  return (token.code >= tok::PLUSEQUAL && token.code <= tok::DOUBLESTAREQUAL) || token.code == tok::DOUBLESLASHEQUAL ||
         (token.code == tok::ATEQUAL && token.view() == "@=");
}

}  // namespace

void CompleteParser::PushInvented(const Token& token) {
  PushLeafOf(TypeOfCode(token.code), token, static_cast<int32_t>(toks_.size()));
}

void CompleteParser::Statement(LineKind kind) {
  switch (Code()) {
    case word::kIf:
      return IfOrWhile(symbols_.if_stmt);
    case word::kElif:
      return IfOrWhile(symbols_.if_stmt);
    case word::kWhile:
      return IfOrWhile(symbols_.while_stmt);
    case word::kElse:
      return Else();
    case word::kTry:
      return TryClause();
    case word::kFinally:
      return Finally();
    case word::kExcept:
      return Except();
    case word::kFor:
      return For();
    case word::kWith:
      return With();
    case word::kDef:
      return Definition();
    case word::kClass:
      return Class();
    case tok::AT:
      return Decorator();
    case word::kAsync:
      if (IsAsyncStatement()) return Async();
      break;
    case word::kMatch:
      if (kind == LineKind::kMatch) return Match();
      SimpleStatement();
      return ExplainHead([this] { Subject(); });
    case word::kCase:
      if (kind == LineKind::kCase) return Case();
      SimpleStatement();
      return ExplainHead([this] { PatternsAndGuard(); });
    default:
      break;
  }
  SimpleStatement();
}

// Of a statement that begins with a word that may begin a head as well, and was read as if it did not.
template <class Rule>
void CompleteParser::ExplainHead(Rule&& rule) {
  ExpectEnd();
  if (!failed_ || !Since(10)) return;
  const ParseError failure = *failure_;
  const size_t furthest = std::exchange(furthest_, 0);
  Revive(0);
  Skip();
  rule();
  if (!failed_ && AtEnd()) return Fail("expected ':'");
  ExpectEnd();
  // What came less far explains less.
  if (furthest_ > furthest) return;
  furthest_ = furthest;
  failure_ = failure;
}

// The body behind a head: a statement on its line, or the placeholder.
void CompleteParser::Suite() {
  if (AtEnd()) return PushInvented(kCompletePass);
  SimpleStatement();
}

void CompleteParser::Colon() {
  if (Code() == tok::COLON) return PushLeaf();
  if (AtEnd() && !EndsAtSemicolon()) Fail("expected ':'");
  FailHere();
}

// The ";" that ends a statement belongs to none.
bool CompleteParser::EndsAtSemicolon() const {
  if (line_ == nullptr || !line_->source || toks_.empty()) return false;
  const char* at = toks_.back().end();
  if (!line_->source->Holds(at)) return false;
  while (at < line_->source->end() && (*at == ' ' || *at == '\t')) ++at;
  return at < line_->source->end() && *at == ';';
}

// Where the language says so whatever stands in the colon's place.
void CompleteParser::ForcedColon() { Expect(tok::COLON, "expected ':'"); }

void CompleteParser::SimpleStatement() {
  switch (Code()) {
    case word::kPass:
    case word::kBreak:
    case word::kContinue:
      return PushLeaf();
    case word::kDel:
      return Delete();
    case word::kAssert:
      return AssertStatement();
    case word::kGlobal:
      return Declaration(symbols_.global_stmt);
    case word::kNonlocal:
      if (python3_) return Declaration(symbols_.nonlocal_stmt);
      break;
    case word::kReturn:
      return Return();
    case word::kRaise:
      return RaiseStatement();
    case word::kImport:
      return Import();
    case word::kFrom:
      return FromImport();
    case word::kPrint:
      if (print_statement_) return PrintStatement();
      break;
    case word::kExec:
      if (!python3_) return ExecStatement();
      break;
    case word::kType:
      if (python3_ && IsName(CodeAt(1)) && (CodeAt(2) == tok::EQUAL || CodeAt(2) == tok::LSQB)) return TypeStatement();
      break;
    default:
      break;
  }
  ExpressionStatement();
}

// ---- compound statements ----

void CompleteParser::IfOrWhile(int symbol) {
  const size_t mark = Mark();
  PushLeaf();
  NamedTest();
  Colon();
  Suite();
  Finish(symbol, mark);
}

void CompleteParser::Else() {
  const size_t mark = Mark();
  for (const Token& token : {kCompleteIf, kCompleteZero, kCompleteColon, kCompletePass}) PushInvented(token);
  PushLeaf();
  ForcedColon();
  Suite();
  Finish(symbols_.if_stmt, mark);
}

void CompleteParser::TryClause() {
  const size_t mark = Mark();
  PushLeaf();
  ForcedColon();
  Suite();
  for (const Token& token : {kCompleteFinally, kCompleteColon, kCompletePass}) PushInvented(token);
  Finish(symbols_.try_stmt, mark);
}

void CompleteParser::Finally() {
  const size_t mark = Mark();
  for (const Token& token : {kCompleteTry, kCompleteColon, kCompletePass}) PushInvented(token);
  PushLeaf();
  ForcedColon();
  Suite();
  Finish(symbols_.try_stmt, mark);
}

void CompleteParser::Except() {
  const size_t mark = Mark();
  for (const Token& token : {kCompleteTry, kCompleteColon, kCompletePass}) PushInvented(token);
  const size_t clause = Mark();
  PushLeaf();
  const bool is_star = Code() == tok::STAR && python3_;
  if (is_star) {
    RequireAt(at_, 11, "Exception groups are");
    // It says nothing of a name.
    Skip();
    if (Code() == tok::COLON || AtEnd()) Fail("expected one or more exception types");
  }
  if (Code() != tok::COLON && !AtEnd()) ExceptTypes(is_star);
  Finish(symbols_.except_clause, clause);
  Colon();
  Suite();
  Finish(symbols_.try_stmt, mark);
}

void CompleteParser::ExceptTypes(bool is_star) {
  const size_t types = Mark();
  const size_t start = at_;
  const size_t clause = start - 1;
  Test();
  if (Code() == tok::COMMA && !python3_) {
    PushLeaf();
    Test();
    CheckTarget(Top(), TargetUse::kAssign, false);
    return;
  }
  if (Code() == tok::COMMA) {
    while (Code() == tok::COMMA) {
      PushLeaf();
      if (!BeginsExpression(Code())) break;
      Test();
    }
    if (Code() == word::kAs) FailAt(start, "multiple exception types must be parenthesized when using 'as'");
    if (!Since(14)) {
      if (Code() == tok::COLON) FailAt(start, "multiple exception types must be parenthesized");
      FailHere();
    }
    Finish(symbols_.testlist_comp, types);
    return;
  }
  if (Code() != word::kAs) return;
  PushLeaf();
  const size_t name = at_;
  if (!python3_) {
    Test();
    CheckTarget(Top(), TargetUse::kAssign, false);
    return;
  }
  if (IsName(Code()) && (CodeAt(1) == tok::COLON || CodeAt(1) == tok::ENDMARKER)) {
    CheckBound(name, clause);
    return PushLeaf();
  }
  if (!BeginsExpression(Code())) FailHere();
  if (!Try([&] { Test(); })) FailGeneric(name);
  Test();
  if (Code() == tok::COLON && !isa<CNameLiteral>(Top()))
    FailAt(name,
           std::string("cannot use except") + (is_star ? "*" : "") + " statement with " + NameOfExpression(Top()));
  FailHere();
}

void CompleteParser::For() {
  const size_t mark = Mark();
  PushLeaf();
  TargetList(TargetUse::kFor);
  PushLeaf();
  StarExpressions(symbols_.testlist_star_expr);
  if (!Since(9)) CheckNoStars(Top());
  CheckNoLoneStar(Top());
  Colon();
  Suite();
  Finish(symbols_.for_stmt, mark);
}

void CompleteParser::With() {
  const size_t mark = Mark();
  PushLeaf();
  if (Code() == tok::LPAR && python3_ && WithItemsInBrackets()) {
    Colon();
    Suite();
    return Finish(symbols_.with_stmt, mark);
  }
  WithItem();
  while (Code() == tok::COMMA) {
    PushLeaf();
    WithItem();
  }
  Colon();
  Suite();
  Finish(symbols_.with_stmt, mark);
}

// `with (a as b, c):`, whose brackets are no expression's. Whatever stands in brackets without "as" is an
// expression as well, and read as one; false for that, and nothing was read.
bool CompleteParser::WithItemsInBrackets() {
  int depth = 0;
  bool has_as = false;
  size_t end = at_;
  for (; end + 1 < code_.size(); ++end) {
    const TokenCode code = code_[end];
    if (code == tok::LPAR || code == tok::LSQB || code == tok::LBRACE) ++depth;
    if (code == tok::RPAR || code == tok::RSQB || code == tok::RBRACE) --depth;
    if (depth == 0) break;
    has_as = has_as || (depth == 1 && code == word::kAs);
  }
  if (!has_as) return false;
  RequireAt(at_, 9, "Parenthesized context managers are");
  Skip();
  const InBracket in_bracket(*this);
  WithItem();
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (Code() == tok::RPAR) {
      // The comma at the end stands in no layout.
      factory_.pool().Reclaim(nodes_.back());
      nodes_.pop_back();
      break;
    }
    WithItem();
  }
  if (Code() != tok::RPAR) FailHere();
  Skip();
  return true;
}

void CompleteParser::WithItem() {
  const size_t mark = Mark();
  Test();
  if (Code() != word::kAs) return;
  PushLeaf();
  const size_t start = at_;
  Binary(kTargetLevel);
  if (Code() != tok::COMMA && Code() != tok::COLON && Code() != tok::RPAR && !AtEnd()) {
    at_ = start;
    Test();
  }
  CheckTarget(Top(), TargetUse::kWith, false);
  Finish(symbols_.with_item, mark);
}

bool CompleteParser::IsAsyncStatement() const {
  if (!Since(5)) return false;
  const TokenCode next = CodeAt(1);
  return next == word::kDef || ((next == word::kFor || next == word::kWith) && IsKeyword(word::kAsync));
}

void CompleteParser::Async() {
  const size_t mark = Mark();
  const size_t start = at_;
  PushLeafOf(tok::ASYNC, TokenAt(at_), index_[at_]);
  Skip();
  if (Code() == word::kDef) {
    Definition();
  } else {
    if (!place_.is_in_async()) {
      Postpone(start,
               Code() == word::kFor ? "'async for' outside async function" : "'async with' outside async function",
               kCompiler);
    }
    if (Code() == word::kFor)
      For();
    else
      With();
  }
  // Type parameters wrap the whole.
  if (isa<CWithTypeParameters>(Top())) {
    CNode* wrapper = Top();
    nodes_.pop_back();
    CNode* definition = factory_.PopChild(wrapper, wrapper->child_count - 1);
    nodes_.push_back(definition);
    Finish(symbols_.async_stmt, mark);
    CNode* statement = Top();
    nodes_.pop_back();
    std::vector<CNode*> children(wrapper->children, wrapper->children + wrapper->child_count);
    children.push_back(statement);
    factory_.SetChildren(wrapper, children);
    nodes_.push_back(wrapper);
    return;
  }
  Finish(symbols_.async_stmt, mark);
}

void CompleteParser::Definition() {
  const size_t mark = Mark();
  PushLeaf();
  if (!IsName(Code())) FailHere();
  const size_t name = at_;
  CheckBound(name, name - 1);
  PushLeaf();
  const size_t parameters = Mark();
  const size_t parameter_count = Code() == tok::LSQB ? TypeParameters() : 0;
  in_generic_ = parameter_count != 0;
  const size_t list = Mark();
  if (Code() != tok::LPAR) {
    if (python3_) Fail("expected '('");
    FailHere();
  }
  PushLeaf();
  {
    const InBracket in_bracket(*this);
    if (Code() != tok::RPAR) Parameters(/*is_lambda=*/false, tok::RPAR);
    Expect(tok::RPAR, nullptr);
  }
  Finish(symbols_.parameters, list);
  if (Code() == tok::RARROW && TokenAt(at_).view() == "->") {
    if (!python3_) FailHere();
    const size_t arrow = at_;
    PushLeaf();
    InTypeScope(AnnotationScope(), [this] { Test(); });
    if (failed_ && failure_->message() == kInvalidSyntax) {
      Revive(Mark());
      const size_t end = EndOfExpression(arrow + 1);
      FailAt(end == kNowhere ? arrow : end, "expected ':'");
    }
  }
  in_generic_ = false;
  ForcedColon();
  Suite();
  FinishWithTypeParameters(symbols_.funcdef, mark, parameters, parameter_count);
}

// The parameters wait behind the first nodes of their statement; they become the first children of what is
// wrapped around it.
void CompleteParser::FinishWithTypeParameters(int symbol, size_t mark, size_t parameters, size_t count) {
  if (count == 0 || failed_) return Finish(symbol, mark);
  const auto begin = nodes_.begin();
  const auto at = [begin](size_t i) { return begin + static_cast<ptrdiff_t>(i); };
  std::rotate(at(mark), at(parameters), at(parameters + count));
  Finish(symbol, mark + count);
  FinishBare<CWithTypeParameters>(mark);
}

void CompleteParser::Class() {
  const size_t mark = Mark();
  PushLeaf();
  if (!IsName(Code())) FailHere();
  CheckBound(at_, at_ - 1);
  PushLeaf();
  const size_t parameters = Mark();
  const size_t parameter_count = Code() == tok::LSQB ? TypeParameters() : 0;
  if (Code() == tok::LPAR) {
    PushLeaf();
    const InBracket in_bracket(*this);
    if (Code() != tok::RPAR) {
      if (python3_)
        InTypeScope(parameter_count != 0 ? kGeneric : nullptr, [this] { Arguments(/*is_of_class=*/true); });
      else
        StarExpressions(symbols_.testlist_star_expr);
    }
    Expect(tok::RPAR, nullptr);
  }
  Colon();
  Suite();
  FinishWithTypeParameters(symbols_.classdef, mark, parameters, parameter_count);
}

size_t CompleteParser::TypeParameters() {
  RequireAt(at_, 12, "Type parameter lists are");
  const InBracket in_bracket(*this);
  Skip();
  if (Code() == tok::RSQB) Fail("Type parameter list cannot be empty");
  size_t count = 0;
  bool has_default = false;
  DistinctNames outer_names = std::exchange(names_, {});
  while (Code() != tok::RSQB) {
    TypeParameter(has_default);
    ++count;
    if (Code() != tok::COMMA) break;
    Skip();
  }
  names_ = std::move(outer_names);
  if (Code() != tok::RSQB) FailHere();
  Skip();
  return count;
}

void CompleteParser::TypeParameter(bool& has_default) {
  const size_t mark = Mark();
  const size_t start = at_;
  const TokenCode star = Code();
  if (star == tok::STAR || star == tok::DOUBLESTAR) PushLeaf();
  if (!IsName(Code())) FailHere();
  const Text name = TokenAt(at_).view();
  if (!names_.Add(name)) Postpone(at_, "duplicate type parameter '" + std::string(name) + "'");
  CheckBound(at_, start);
  PushLeaf();
  if (Code() == tok::COLON) {
    const size_t colon = at_;
    if (star == tok::STAR || star == tok::DOUBLESTAR) {
      Skip();
      Test();
      const bool is_constraint = isa<CAtom>(Top()) && Top()->ChildIs(0, tok::LPAR);
      FailAt(colon, std::string("cannot use ") + (is_constraint ? "constraints" : "bound") + " with " +
                        (star == tok::STAR ? "TypeVarTuple" : "ParamSpec"));
    }
    PushLeaf();
    InTypeScope(kBound, [this] { Test(); });
  }
  if (Code() == tok::EQUAL) {
    RequireAt(at_, 13, "Type parameter defaults are");
    has_default = true;
    PushLeaf();
    if (star == tok::STAR)
      InTypeScope("a TypeVarTuple default", [this] { TestOrStar(); });
    else
      InTypeScope(star == tok::DOUBLESTAR ? "a ParamSpec default" : "a TypeVar default", [this] { Test(); });
  } else if (has_default) {
    Postpone(start, "non-default type parameter '" + std::string(name) + "' follows default type parameter");
  }
  FinishBare<CTypeParameter>(mark);
}

const char* CompleteParser::AnnotationScope() const {
  return Since(14) ? kAnnotation : in_generic_ ? kGeneric : nullptr;
}

// Of what stands in a type scope itself the first is told.
void CompleteParser::JudgeTypeScope(size_t first_banned, size_t first_wait) {
  for (size_t i = first_wait; i < waits_.size(); ++i) {
    if (waits_[i].is_comprehension)
      Postpone(waits_[i].at, kAsyncComprehensionOutside, kCompiler);
    else
      banned_.push_back({waits_[i].at, "await expression"});
  }
  waits_.resize(std::min(first_wait, waits_.size()));
  const auto begin = banned_.begin() + static_cast<ptrdiff_t>(std::min(first_banned, banned_.size()));
  const auto first =
      std::min_element(begin, banned_.end(), [](const Banned& a, const Banned& b) { return a.at < b.at; });
  if (first != banned_.end()) {
    const bool is_constraint = type_scope_ == kBound && IsBracketed(Top()) && Top()->ChildIs(0, tok::LPAR);
    Postpone(first->at, std::string(first->what) + " cannot be used within " +
                            (is_constraint ? "a TypeVar constraint" : type_scope_));
  }
  banned_.erase(begin, banned_.end());
}

void CompleteParser::TypeStatement() {
  const size_t mark = Mark();
  RequireAt(at_, 12, "Type statement is");
  Skip();
  CheckBound(at_, at_);
  PushLeaf();
  const size_t parameters = Mark();
  const size_t parameter_count = Code() == tok::LSQB ? TypeParameters() : 0;
  Expect(tok::EQUAL, nullptr);
  InTypeScope(kAlias, [this] { Test(); });
  FinishWithTypeParameters(symbols_.expr_stmt, mark, parameters, parameter_count);
}

// A dotted name with one call at most is laid out as the tables have it; any other expression is read.
void CompleteParser::Decorator() {
  const size_t mark = Mark();
  PushLeaf();
  if (IsDottedDecorator()) {
    DottedName();
    if (Code() == tok::LPAR) {
      PushLeaf();
      const InBracket in_bracket(*this);
      if (Code() != tok::RPAR) Arguments();
      Expect(tok::RPAR, nullptr);
    }
    if (!AtEnd()) FailHere();
    PushLeafOf(tok::NEWLINE, Token{"\n", 1, tok::NEWLINE}, static_cast<int32_t>(toks_.size()));
    return Finish(symbols_.decorator, mark);
  }
  if (!Since(9)) {
    DottedName();
    if (Code() == tok::LPAR) {
      const size_t call = Mark();
      PushLeaf();
      const InBracket in_bracket(*this);
      if (Code() != tok::RPAR) Arguments();
      Expect(tok::RPAR, nullptr);
      FinishBare<CNode>(call);
    }
    FailHere();
  }
  NamedTest();
  FinishBare<CNode>(mark);
}

// Whether what follows the "@" is a dotted name with at most one call, up to the end.
bool CompleteParser::IsDottedDecorator() const {
  size_t at = at_;
  while (IsName(code_[at]) && code_[at + 1] == tok::DOT) at += 2;
  if (!IsName(code_[at])) return false;
  ++at;
  if (code_[at] == tok::ENDMARKER) return true;
  if (code_[at] != tok::LPAR) return false;
  int depth = 0;
  for (; at + 1 < code_.size(); ++at) {
    const TokenCode code = code_[at];
    if (code == tok::LPAR || code == tok::LSQB || code == tok::LBRACE) ++depth;
    if (code == tok::RPAR || code == tok::RSQB || code == tok::RBRACE) --depth;
    if (depth == 0) return code_[at + 1] == tok::ENDMARKER;
  }
  return true;
}

// ---- simple statements ----

void CompleteParser::ExpressionStatement() {
  const size_t mark = Mark();
  const size_t start = at_;
  const bool begins_with_yield = Code() == word::kYield;
  if (begins_with_yield)
    Yield();
  else
    StarExpressions(symbols_.testlist_star_expr);

  if (Code() == tok::COLON && python3_ && !begins_with_yield) return Annotation(mark, start);
  if (!AtEnd() && IsAugmentedAssignment(TokenAt(at_))) {
    CNode* target = Top();
    if (begins_with_yield) FailAt(start, "'yield expression' is an illegal expression for augmented assignment");
    if (Code() == tok::ATEQUAL && !Since(5)) RequireAt(at_, 5, "The '@' operator is");
    PushLeaf();
    if (Code() == word::kYield)
      Yield();
    else
      StarExpressions(symbols_.testlist_star_expr);
    if (!Since(8)) CheckNoStars(Top());
    CheckNoLoneStar(Top());
    const bool is_sequence =
        isa<CTestListStarExpr>(target) || isa<CStarExpression>(target) || IsBracketed(WithoutBrackets(target));
    if (is_sequence || InvalidTarget(target, TargetUse::kAugment) != nullptr) {
      FailAtNode(target,
                 std::string("'") + NameOfExpression(target) + "' is an illegal expression for augmented assignment");
    }
    CheckTargetNames(target, TargetUse::kAugment);
    return Finish(symbols_.expr_stmt, mark);
  }
  if (Code() != tok::EQUAL) {
    if (!begins_with_yield) CheckNoLoneStar(Top());
    if (!AtEnd() && Code() == tok::COLONEQUAL) FailHere();
    return;
  }
  std::vector<size_t> targets;
  while (Code() == tok::EQUAL) {
    targets.push_back(Mark() - 1);
    if (InvalidTarget(Top(), TargetUse::kAssign) != nullptr) FailAtTargetOf(Mark() - 1);
    PushLeaf();
    if (Code() == word::kYield)
      Yield();
    else
      StarExpressions(symbols_.testlist_star_expr);
  }
  for (const size_t target : targets) {
    CNode* node = nodes_[target];
    if (isa<CYieldExpr>(node) || node->code == word::kYield)
      FailAtNode(node, "assignment to yield expression not possible");
    CheckTarget(node, TargetUse::kAssign, /*may_mean_equal=*/false);
    if (isa<CStarExpression>(node))
      PostponeAtNode(node, "starred assignment target must be in a list or tuple", kCompiler);
  }
  if (!Since(0)) CheckNoStars(Top());
  CheckNoLoneStar(Top());
  Finish(symbols_.expr_stmt, mark);
}

// At the "=" behind what is no target.
void CompleteParser::FailAtTargetOf(size_t mark) {
  const bool may_be_comparison = Try([&] {
    Skip();
    Binary(kTargetLevel);
    if (Code() == tok::EQUAL || Code() == tok::COLONEQUAL) FailHere();
  });
  CheckTarget(nodes_[mark], TargetUse::kAssign, may_be_comparison);
  FailHere();
}

// `target: type [= value]`, at the colon.
void CompleteParser::Annotation(size_t mark, size_t start) {
  CNode* target = Top();
  const size_t colon = at_;
  const size_t annotation = Mark();
  const bool is_target = InvalidTarget(target, TargetUse::kAnnotate) == nullptr && !isa<CStarExpression>(target);
  // Nobody looks behind the colon of what is neither a target nor would be one with a type there.
  if (!is_target && !Try([&] { Skip(), Test(); })) FailGeneric(colon);
  PushLeaf();
  if (AtEnd()) FailHere();
  const size_t waits = waits_.size();
  const bool was_compiled = judge_ <= kCompiler;
  InTypeScope(AnnotationScope(), [this] { Test(); });
  using Scope = StatementPlace::Scope;
  // In a function it is never evaluated, and nothing in it waits.
  if (place_.scope == Scope::kFunction && Since(7)) waits_.resize(std::min(waits, waits_.size()));
  const bool is_in_function = place_.scope == Scope::kFunction || place_.is_in_async();
  if (is_in_function && Since(9) && !Since(14) && !was_compiled && judge_ == kCompiler) {
    postponed_.reset();
    judge_ = kNobody;
  }
  if (isa<CTestListStarExpr>(target)) FailAt(start, "only single target (not tuple) can be annotated");
  if (isa<CStarExpression>(target)) FailGeneric(colon);
  if (const CNode* inner = WithoutBrackets(target); IsBracketed(inner)) {
    FailAtNode(inner, inner->ChildIs(0, tok::LSQB) ? "only single target (not list) can be annotated"
                                                   : "only single target (not tuple) can be annotated");
  }
  if (!is_target || (Since(9) && BeginsWithBracketedTarget(target)))
    FailAtNode(target, "illegal target for annotation");
  if (!Since(6)) RequireAt(colon, 6, "Variable annotation syntax is");
  CheckTargetNames(target, TargetUse::kAnnotate);
  if (Code() == tok::EQUAL) {
    PushLeaf();
    if (Code() == word::kYield) {
      Yield();
    } else {
      StarExpressions(symbols_.testlist_star_expr);
      if (!Since(8)) {
        CheckNoStars(Top());
        if (isa<CTestListStarExpr>(Top())) FailAtNode(Top(), "invalid syntax");
      }
    }
    CheckNoLoneStar(Top());
  } else {
    CheckSubscriptStars(WithoutBrackets(target));
  }
  Finish(symbols_.annassign, annotation);
  Finish(symbols_.expr_stmt, mark);
}

void CompleteParser::Delete() {
  const size_t mark = Mark();
  PushLeaf();
  const size_t list = Mark();
  TestOrStar();
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (!BeginsExpression(Code()) && Code() != tok::STAR) break;
    TestOrStar();
  }
  Finish(symbols_.exprlist, list);
  if (InvalidTarget(Top(), TargetUse::kDelete) == nullptr && !AtEnd()) FailHere();
  CheckTarget(Top(), TargetUse::kDelete, false);
  Finish(symbols_.del_stmt, mark);
}

void CompleteParser::AssertStatement() {
  const size_t mark = Mark();
  PushLeaf();
  const size_t start = at_;
  const size_t test = Mark();
  Test();
  if (Code() == tok::EQUAL && Since(0)) FailAtEqual(start, test);
  if (Code() == tok::COMMA) {
    PushLeaf();
    Test();
  }
  Finish(symbols_.assert_stmt, mark);
}

void CompleteParser::Declaration(int symbol) {
  const size_t mark = Mark();
  const size_t start = at_;
  const bool is_nonlocal = Code() == word::kNonlocal;
  PushLeaf();
  PushName();
  while (Code() == tok::COMMA) {
    PushLeaf();
    PushName();
  }
  if (is_nonlocal && place_.scope == StatementPlace::Scope::kModule)
    Postpone(start, "nonlocal declaration not allowed at module level");
  Finish(symbol, mark);
}

void CompleteParser::Return() {
  const size_t mark = Mark();
  const size_t start = at_;
  PushLeaf();
  if (!AtEnd()) {
    StarExpressions(symbols_.testlist_star_expr);
    if (!Since(8)) CheckNoStars(Top());
    CheckNoLoneStar(Top());
  }
  using Scope = StatementPlace::Scope;
  if (place_.scope == Scope::kModule || place_.scope == Scope::kClass)
    Postpone(start, "'return' outside function", kCompiler);
  Finish(symbols_.return_stmt, mark);
}

void CompleteParser::RaiseStatement() {
  const size_t mark = Mark();
  PushLeaf();
  if (!AtEnd()) {
    Test();
    if (python3_ && Code() == word::kFrom) {
      PushLeaf();
      Test();
    } else if (!python3_) {
      for (int i = 0; i < 2 && Code() == tok::COMMA; ++i) {
        PushLeaf();
        Test();
      }
    }
  }
  Finish(symbols_.raise_stmt, mark);
}

void CompleteParser::DottedName() {
  const size_t mark = Mark();
  PushName();
  while (Code() == tok::DOT) {
    PushLeaf();
    PushName();
  }
  Finish(symbols_.dotted_name, mark);
}

void CompleteParser::Import() {
  const size_t mark = Mark();
  const size_t statement = at_;
  PushLeaf();
  if (AtEnd() && python3_) Fail("Expected one or more names after 'import'");
  const size_t names = Mark();
  for (;;) {
    const size_t one = Mark();
    const size_t start = at_;
    DottedName();
    if (Code() == word::kAs) {
      PushLeaf();
      ImportTarget(statement);
    } else if (at_ == start + 1 || Since(9)) {
      CheckBound(start, statement);
    }
    Finish(symbols_.dotted_as_name, one);
    if (Code() != tok::COMMA) break;
    PushLeaf();
  }
  Finish(symbols_.dotted_as_names, names);
  Finish(symbols_.import_name, mark);
}

// The name behind `as`.
void CompleteParser::ImportTarget(size_t statement) {
  const size_t name = at_;
  const TokenCode next = CodeAt(1);
  if (IsName(Code()) && (next == tok::COMMA || next == tok::RPAR || next == tok::ENDMARKER)) {
    CheckBound(name, statement);
    return PushLeaf();
  }
  if (!BeginsExpression(Code())) FailHere();
  if (!Try([&] { Test(); })) FailGeneric(name);
  Test();
  FailAt(name, std::string("cannot use ") + NameOfExpression(Top()) + " as import target");
}

void CompleteParser::FromImport() {
  const size_t mark = Mark();
  const size_t statement = at_;
  PushLeaf();
  bool has_dots = false;
  while (Code() == tok::DOT || Code() == tok::ELLIPSIS) {
    has_dots = true;
    PushLeafOf(TypeOfCode(Code()), TokenAt(at_), index_[at_]);
    Skip();
  }
  if (!has_dots || Code() != word::kImport) DottedName();
  if (Code() != word::kImport) FailHere();
  PushLeaf();
  if (Code() == tok::STAR) {
    PushLeaf();
    if (place_.scope != StatementPlace::Scope::kModule && (python3_))
      Postpone(at_ - 1, "import * only allowed at module level");
    return Finish(symbols_.import_from, mark);
  }
  const bool is_bracketed = Code() == tok::LPAR;
  if (is_bracketed) PushLeaf();
  if (AtEnd() && python3_ && !is_bracketed) Fail("Expected one or more names after 'import'");
  const size_t names = Mark();
  for (;;) {
    const size_t one = Mark();
    const size_t start = at_;
    PushName();
    if (Code() == word::kAs) {
      PushLeaf();
      ImportTarget(statement);
    } else {
      CheckBound(start, statement);
    }
    Finish(symbols_.import_as_name, one);
    if (Code() != tok::COMMA) break;
    PushLeaf();
    if (is_bracketed && Code() == tok::RPAR) break;
    if (!is_bracketed && AtEnd()) Fail("trailing comma not allowed without surrounding parentheses");
  }
  Finish(symbols_.import_as_names, names);
  if (is_bracketed) Expect(tok::RPAR, nullptr);
  Finish(symbols_.import_from, mark);
}

// A name that no statement may bind.
void CompleteParser::CheckBound(size_t at, size_t place) {
  const Text name = TokenAt(at).view();
  if (name == "__debug__" || (!python3_ && code_[at] == word::kNone))
    Postpone(place, "cannot assign to " + std::string(name), kCompiler);
}

// ---- of 2 alone ----

void CompleteParser::PrintStatement() {
  const size_t mark = Mark();
  PushLeaf();
  if (Code() == tok::RIGHTSHIFT) {
    PushLeaf();
    Test();
    if (Code() == tok::COMMA && !BeginsExpression(CodeAt(1))) {
      Skip();
      FailHere();
    }
  } else if (BeginsExpression(Code())) {
    Test();
  }
  while (Code() == tok::COMMA && Mark() - mark > 1) {
    PushLeaf();
    if (!BeginsExpression(Code())) break;
    Test();
  }
  FinishBare<CNode>(mark);
}

void CompleteParser::ExecStatement() {
  const size_t mark = Mark();
  PushLeaf();
  Binary(kTargetLevel);
  if (Code() == word::kIn) {
    PushLeaf();
    Test();
    if (Code() == tok::COMMA) {
      PushLeaf();
      Test();
    }
  }
  FinishBare<CNode>(mark);
}

}  // namespace quillet
