// Expressions: operators by how tightly they bind, over stacks of their own, and between them values with
// their trailers.
#include <algorithm>

#include "lines/token_search.h"
#include "syntax/reader_impl.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

NumberType TypeOfNumber(Text number) {
  const char last = static_cast<char>(number.back() | 0x20);
  if (number.size() > 1 && number[0] == '0' && (number[1] | 0x20) == 'x')
    return last == 'l' ? NumberType::kLong : NumberType::kInt;
  if (last == 'j') return NumberType::kComplex;
  if (last == 'l') return NumberType::kLong;
  return number.find_first_of(".eE") != Text::npos ? NumberType::kFloat : NumberType::kInt;
}

CompareOperator CompareOperatorOf(TokenCode code) {
  switch (code) {
    case tok::NOTEQUAL:
      return CompareOperator::kNotEqual;
    case tok::LESS:
      return CompareOperator::kLess;
    case tok::GREATER:
      return CompareOperator::kGreater;
    case tok::LESSEQUAL:
      return CompareOperator::kLessEqual;
    case tok::GREATEREQUAL:
      return CompareOperator::kGreaterEqual;
    case word::kIs:
      return CompareOperator::kIs;
    case word::kIn:
      return CompareOperator::kIn;
    default:
      return CompareOperator::kEqual;
  }
}

}  // namespace

// ---- lists and conditionals ----

ExprId SyntaxReader::Impl::OneOrTuple(ExprId (Impl::*read)()) {
  const uint32_t begin = Begin();
  const ExprId first = (this->*read)();
  if (!Is(tok::COMMA)) return first;
  const size_t mark = scratch_.size();
  Push(first);
  bool has_trailing_comma = false;
  while (!has_trailing_comma && Take(tok::COMMA)) {
    has_trailing_comma = !BeginsExpression();
    if (!has_trailing_comma) Push((this->*read)());
  }
  const ExprId tuple = NodeOf(ExprKind::kTuple, begin, mark);
  if (has_trailing_comma) Flag(tuple, kTrailingComma);
  return tuple;
}

ExprId SyntaxReader::Impl::StarExpression() {
  if (!Is(tok::STAR) && !Is(tok::DOUBLESTAR)) return Expression();
  const ExprKind kind = Is(tok::STAR) ? ExprKind::kStarred : ExprKind::kDoubleStarred;
  const uint32_t begin = Begin();
  Step();
  return Node(kind, begin, {Expression()});
}

ExprId SyntaxReader::Impl::Expression() {
  const uint32_t begin = Begin();
  ExprId value = Operators(kOrBinding);
  if (Is(word::kIf) && takes_conditionals_) value = Conditional(value, begin);
  if (!Is(tok::COLONEQUAL) || TooDeep()) return value;
  Level level(*this);
  Step();
  MarkTarget(value);
  const ExprId named = Expression();
  return Node(ExprKind::kNamed, begin, {value, named});
}

// At the `if` behind a value. A chain of them is read first, and put together from its end.
ExprId SyntaxReader::Impl::Conditional(ExprId value, uint32_t begin) {
  const size_t base = conditions_.size();
  ExprId otherwise;
  while (true) {
    Step();
    const ExprId condition = Operators(kOrBinding);
    conditions_.push_back({value, condition, begin});
    if (!Take(word::kElse)) {
      otherwise = Missing();
      break;
    }
    begin = Begin();
    value = otherwise = Operators(kOrBinding);
    if (!Is(word::kIf)) break;
  }
  for (; conditions_.size() > base; conditions_.pop_back()) {
    const Condition& last = conditions_.back();
    otherwise = Node(ExprKind::kConditional, last.begin, {last.value, last.condition, otherwise});
  }
  return otherwise;
}

// ---- operators ----

bool SyntaxReader::Impl::IsPrefix() const {
  return (marks_[Code()] & kIsPrefix) != 0 || (Is(word::kAwait) && IsAwait());
}

// Whether the word at hand waits, and is no name as it was up to 3.6 outside of coroutines.
bool SyntaxReader::Impl::IsAwait() const {
  if (version_.AtLeast(3, 7)) return true;
  if (!version_.AtLeast(3, 5)) return false;
  const StmtId function = blocks_.back().function;
  return function != kModuleStmt && (out_->stmts[function].flags & kAsyncStmt) != 0;
}

ExprId SyntaxReader::Impl::Operators(uint8_t least) {
  const size_t base = operations_.size();
  if (!IsPrefix()) [[likely]] {
    const uint32_t begin = Begin();
    const ExprId value = Primary();
    if (bindings_[Code()] < least || bindings_[Code()] == kNoBinding) return value;
    operands_.push_back({value, begin});
    if (!TakeOperation(least, base)) {
      operands_.pop_back();
      return value;
    }
  }
  do {
    for (; IsPrefix(); Step()) {
      const TokenCode code = Code();
      const uint8_t binding = code == word::kNot ? kNotBinding : code == word::kAwait ? kAwaitBinding : kSignBinding;
      operations_.push_back({code, binding, code, true, 0, Begin()});
    }
    const uint32_t begin = Begin();
    const ExprId value = Primary();
    operands_.push_back({value, begin});
  } while (TakeOperation(least, base));
  while (operations_.size() > base) Reduce();
  const ExprId whole = operands_.back().expr;
  operands_.pop_back();
  return whole;
}

// Takes the operator behind an operand, where one stands that binds so tightly.
bool SyntaxReader::Impl::TakeOperation(uint8_t least, size_t base) {
  const TokenCode code = Code();
  const uint8_t binding = bindings_[code];
  if (binding == kNoBinding || binding < least) return false;
  const bool is_not_in = code == word::kNot;
  if (is_not_in && NextCode() != word::kIn) return false;
  while (operations_.size() > base) {
    const uint8_t top = operations_.back().binding;
    if (top < binding || (top == binding && (binding == kPowerBinding || binding == kCompareBinding))) break;
    Reduce();
  }
  Step();
  if (binding != kCompareBinding) {
    operations_.push_back({code, binding, code, false, 2, 0});
    return true;
  }
  CompareOperator compare = CompareOperatorOf(code);
  if (is_not_in) {
    Step();
    compare = CompareOperator::kNotIn;
  } else if (code == word::kIs && Take(word::kNot)) {
    compare = CompareOperator::kIsNot;
  }
  if (operations_.size() > base && operations_.back().binding == kCompareBinding)
    ++operations_.back().operands;
  else
    operations_.push_back({code, binding, static_cast<uint8_t>(compare), false, 2, 0});
  return true;
}

// Makes an expression of the last operation and its operands.
void SyntaxReader::Impl::Reduce() {
  const Operation operation = operations_.back();
  operations_.pop_back();
  if (operation.is_prefix) {
    const ExprKind kind = operation.code == word::kAwait ? ExprKind::kAwait : ExprKind::kUnary;
    const uint8_t op = kind == ExprKind::kAwait ? 0 : operation.op;
    operands_.back() = {Node(kind, operation.begin, {operands_.back().expr}, op), operation.begin};
    return;
  }
  const size_t first = operands_.size() - operation.operands;
  const uint32_t begin = operands_[first].begin;
  const ExprKind kind = operation.binding == kCompareBinding ? ExprKind::kCompare
                        : operation.binding <= kAndBinding   ? ExprKind::kBoolean
                                                             : ExprKind::kBinary;
  ExprId whole;
  if (operation.operands == 2) {
    whole = Node(kind, begin, {operands_[first].expr, operands_[first + 1].expr}, operation.op);
  } else {
    const size_t mark = scratch_.size();
    for (size_t i = first; i < operands_.size(); ++i) Push(operands_[i].expr);
    whole = NodeOf(kind, begin, mark, operation.op);
  }
  operands_.resize(first + 1);
  operands_[first] = {whole, begin};
}

// ---- values ----

// A value with its trailers.
ExprId SyntaxReader::Impl::Primary() {
  const uint32_t begin = Begin();
  const ExprId value = Atom();
  const TokenCode code = Code();
  if (code != tok::DOT && code != tok::LPAR && code != tok::LSQB) return value;
  return Trailers(value, begin);
}

ExprId SyntaxReader::Impl::Atom() {
  switch (Code()) {
    case tok::NUMBER:
      return Number();
    case tok::STRING:
      return String();
    case tok::LPAR:
      return Group();
    case tok::LSQB:
      return List();
    case tok::LBRACE:
      return Brace();
    case tok::BACKQUOTE:
      return Backquote();
    case tok::ELLIPSIS:
      return Constant(ConstantValue::kEllipsis);
    case word::kNone:
      return Constant(ConstantValue::kNone);
    case word::kTrue:
      return Constant(ConstantValue::kTrue);
    case word::kFalse:
      return Constant(ConstantValue::kFalse);
    case word::kLambda:
      return Lambda();
    case word::kYield:
      return Yield();
    default:
      break;
  }
  if (!IsName()) return Is(tok::DOT) ? MissingAt(Begin()) : Missing();
  if (place_.at[1].code == tok::STRING && IsTemplatePrefix(*place_.at)) [[unlikely]]
    return String();
  return Name();
}

ExprId SyntaxReader::Impl::Name() {
  const uint32_t begin = Begin();
  const ExprId name = Add(ExprKind::kName, begin, begin + place_.at->length);
  SetName(name, *place_.at);
  Step();
  return name;
}

ExprId SyntaxReader::Impl::Number() {
  const uint32_t begin = Begin();
  const auto type = static_cast<uint8_t>(TypeOfNumber(place_.at->view()));
  Step();
  return Add(ExprKind::kNumber, begin, LastEnd(), type);
}

// The words are names in Python 2.
ExprId SyntaxReader::Impl::Constant(ConstantValue value) {
  const uint32_t begin = Begin();
  const ExprId constant = Add(ExprKind::kConstant, begin, begin + place_.at->length, static_cast<uint8_t>(value));
  if (is_python2_ && !Is(tok::ELLIPSIS)) SetName(constant, *place_.at);
  Step();
  return constant;
}

ExprId SyntaxReader::Impl::MissingAt(uint32_t place) {
  const ExprId missing = Add(ExprKind::kMissing, place, place);
  out_->exprs[missing].name_begin = out_->exprs[missing].name_end = place;
  Break(missing);
  return missing;
}

// The bracket at hand and all in it, where nothing deeper is read.
ExprId SyntaxReader::Impl::SkipBracket() {
  const uint32_t begin = Begin();
  size_t depth = 0;
  do {
    if (IsOpeningBracket(Code())) ++depth;
    if (IsClosingBracket(Code())) --depth;
    Step();
  } while (depth > 0 && !AtEnd());
  const ExprId skipped = Add(ExprKind::kMissing, begin, LastEnd());
  SetNoName(skipped);
  Break(skipped);
  return skipped;
}

ExprId SyntaxReader::Impl::Trailers(ExprId value, uint32_t begin) {
  const bool is_missing = out_->exprs[value].kind == ExprKind::kMissing;
  while (true) {
    switch (Code()) {
      case tok::DOT:
        value = Attribute(value, begin);
        break;
      case tok::LPAR:
        if (is_missing) return value;
        value = Call(value, begin);
        break;
      case tok::LSQB:
        if (is_missing) return value;
        value = Subscript(value, begin);
        break;
      default:
        return value;
    }
  }
}

ExprId SyntaxReader::Impl::Attribute(ExprId value, uint32_t begin) {
  Step();
  const Token& name = *place_.at;
  // A keyword that touches the dot is the name that is being typed.
  const bool is_name = IsName() || (IsWordCode(name.code) && name.text == place_.at[-1].end());
  const ExprId attribute = Add(ExprKind::kAttribute, begin, LastEnd());
  SetChildren(attribute, {value});
  if (is_name) {
    SetName(attribute, name);
    Step();
    EndHere(attribute);
  } else {
    SetNoName(attribute);
    Break(attribute);
  }
  return attribute;
}

ExprId SyntaxReader::Impl::Call(ExprId function, uint32_t begin) {
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  Push(function);
  const bool is_closed = Arguments();
  const ExprId call = NodeOf(ExprKind::kCall, begin, mark);
  if (!is_closed) Fault();
  if (faults_ != faults) Flag(call, kIsBroken);
  return call;
}

// The arguments in the brackets at hand, onto the stack; false where they are not closed.
bool SyntaxReader::Impl::Arguments() {
  if (TooDeep()) {
    SkipBracket();
    return false;
  }
  const uint32_t begin = Begin();
  const size_t mark = scratch_.size();
  Level level(*this, tok::LPAR);
  const bool is_closed = Items(tok::RPAR, tok::ENDMARKER, [this] { Argument(); });
  if (scratch_.size() == mark + 1) {
    // A generator alone has the call's brackets for its own.
    Expr& only = out_->exprs[scratch_.back()];
    if (only.kind == ExprKind::kGenerator && (only.flags & kParenthesized) == 0) {
      only.begin = begin;
      only.end = LastEnd();
    }
  }
  return is_closed;
}

void SyntaxReader::Impl::Argument() {
  const uint32_t begin = Begin();
  if (IsName() && place_.at[1].code == tok::EQUAL) {
    const ExprId keyword = Add(ExprKind::kKeyword, begin, begin);
    SetName(keyword, *place_.at);
    place_.at += 2;
    const ExprId value = Expression();
    SetChildren(keyword, {value});
    EndHere(keyword);
    return Push(keyword);
  }
  const ExprId value = StarExpression();
  Push(IsClause() ? Generator(value, begin) : value);
}

ExprId SyntaxReader::Impl::Subscript(ExprId value, uint32_t begin) {
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  bool is_closed = false;
  bool has_trailing_comma = false;
  Push(value);
  if (TooDeep()) {
    SkipBracket();
  } else {
    Level level(*this, tok::LSQB);
    is_closed = Items(
        tok::RSQB, tok::COLON, [this] { SubscriptItem(); }, &has_trailing_comma);
  }
  if (!is_closed || scratch_.size() == mark + 1) Fault();
  const ExprId subscript = NodeOf(ExprKind::kSubscript, begin, mark);
  if (has_trailing_comma) Flag(subscript, kTrailingComma);
  if (faults_ != faults) Flag(subscript, kIsBroken);
  return subscript;
}

void SyntaxReader::Impl::SubscriptItem() {
  const uint32_t begin = Begin();
  const ExprId lower = Is(tok::COLON) ? kNoExpr : StarExpression();
  if (!Take(tok::COLON)) return Push(lower);
  const ExprId upper = BeginsExpression() ? Expression() : kNoExpr;
  const ExprId step = Take(tok::COLON) && BeginsExpression() ? Expression() : kNoExpr;
  Push(Node(ExprKind::kSlice, begin, {lower, upper, step}));
}

// ---- brackets ----

ExprId SyntaxReader::Impl::Group() {
  if (TooDeep()) return SkipBracket();
  const uint32_t begin = Begin();
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  bool has_trailing_comma = false;
  Level level(*this, tok::LPAR);
  const auto item = [this] {
    const uint32_t item_begin = Begin();
    const ExprId value = StarExpression();
    Push(IsClause() ? Generator(value, item_begin) : value);
  };
  const bool is_closed = Items(tok::RPAR, tok::ENDMARKER, item, &has_trailing_comma);
  const size_t count = scratch_.size() - mark;
  ExprId group;
  if (count == 1 && !has_trailing_comma) {
    group = scratch_.back();
    scratch_.pop_back();
    Expr& only = out_->exprs[group];
    if (only.kind == ExprKind::kGenerator && (only.flags & kParenthesized) == 0) {
      only.begin = begin;
      only.end = LastEnd();
    }
  } else if (count == 0 && !is_closed) {
    group = Missing();
  } else {
    group = NodeOf(ExprKind::kTuple, begin, mark);
    if (has_trailing_comma) Flag(group, kTrailingComma);
  }
  Flag(group, kParenthesized);
  if (!is_closed) Fault();
  if (faults_ != faults) Flag(group, kIsBroken);
  return group;
}

ExprId SyntaxReader::Impl::List() {
  if (TooDeep()) return SkipBracket();
  const uint32_t begin = Begin();
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  size_t clauses_end = 0;  // of a comprehension
  Level level(*this, tok::LSQB);
  const bool is_closed = Items(tok::RSQB, tok::ENDMARKER, [&] {
    const uint32_t item_begin = Begin();
    const ExprId value = StarExpression();
    if (IsClause() && scratch_.size() == mark) {
      Push(value);
      Clauses(true);
      clauses_end = scratch_.size();
    } else {
      Push(IsClause() ? Generator(value, item_begin) : value);
    }
  });
  if (clauses_end > 0 && scratch_.size() > clauses_end) scratch_.resize(clauses_end);
  const ExprId list = NodeOf(clauses_end > 0 ? ExprKind::kListComprehension : ExprKind::kList, begin, mark);
  if (!is_closed) Fault();
  if (faults_ != faults) Flag(list, kIsBroken);
  return list;
}

// A dictionary, a set, or a comprehension of one; the first item says which.
ExprId SyntaxReader::Impl::Brace() {
  if (TooDeep()) return SkipBracket();
  const uint32_t begin = Begin();
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  size_t clauses_end = 0;  // of a comprehension
  bool is_set = false;
  Level level(*this, tok::LBRACE);
  const bool is_closed = Items(tok::RBRACE, tok::ENDMARKER, [&] {
    const bool is_first = scratch_.size() == mark;
    const bool is_double_star = Is(tok::DOUBLESTAR);
    const ExprId key = StarExpression();
    if (is_first) is_set = !is_double_star && !Is(tok::COLON);
    Push(key);
    if (is_set) {
    } else if (is_double_star) {
      Push(kNoExpr);
    } else {
      Push(Take(tok::COLON) ? Expression() : Missing());
    }
    if (!IsClause()) return;
    const size_t end = scratch_.size();
    Clauses();
    if (is_first)
      clauses_end = scratch_.size();
    else
      scratch_.resize(end);
  });
  ExprKind kind = is_set ? ExprKind::kSet : ExprKind::kDict;
  if (clauses_end > 0) {
    scratch_.resize(clauses_end);
    kind = is_set ? ExprKind::kSetComprehension : ExprKind::kDictComprehension;
  }
  const ExprId brace = NodeOf(kind, begin, mark);
  if (!is_closed) Fault();
  if (faults_ != faults) Flag(brace, kIsBroken);
  return brace;
}

// The `repr` of Python 2.
ExprId SyntaxReader::Impl::Backquote() {
  const uint32_t begin = Begin();
  if (TooDeep()) {
    Step();
    return Missing();
  }
  Level level(*this);
  Step();
  const ExprId value = Expressions();
  const bool is_closed = Take(tok::BACKQUOTE);
  const ExprId quoted = Node(ExprKind::kBackquote, begin, {value});
  if (!is_closed) Break(quoted);
  return quoted;
}

ExprId SyntaxReader::Impl::Lambda() {
  const uint32_t begin = Begin();
  const uint32_t faults = faults_;
  const bool takes_conditionals = takes_conditionals_;
  if (TooDeep()) {
    Step();
    return Missing();
  }
  Level level(*this);
  const size_t mark = scratch_.size();
  Step();
  ++lambdas_;
  const bool has_body = Items(tok::COLON, tok::SLASH, [this] { Parameter(true); });
  takes_conditionals_ = takes_conditionals;
  Push(has_body ? Expression() : Missing());
  --lambdas_;
  const ExprId lambda = NodeOf(ExprKind::kLambda, begin, mark);
  out_->has_lambdas = true;
  if (faults_ != faults) Flag(lambda, kIsBroken);
  return lambda;
}

ExprId SyntaxReader::Impl::Yield() {
  const uint32_t begin = Begin();
  if (TooDeep()) {
    Step();
    return Missing();
  }
  Level level(*this);
  Step();
  const StmtId function = blocks_.back().function;
  if (function != kModuleStmt && lambdas_ == 0) out_->stmts[function].flags |= kHasYield;
  if (Take(word::kFrom)) {
    const ExprId value = Expression();
    return Node(ExprKind::kYieldFrom, begin, {value});
  }
  if (!BeginsExpression()) return Node(ExprKind::kYield, begin, {});
  const ExprId value = Expressions();
  return Node(ExprKind::kYield, begin, {value});
}

// ---- comprehensions ----

bool SyntaxReader::Impl::IsClause() const { return Is(word::kFor) || (Is(word::kAsync) && NextCode() == word::kFor); }

ExprId SyntaxReader::Impl::Generator(ExprId element, uint32_t begin) {
  const size_t mark = scratch_.size();
  Push(element);
  Clauses();
  return NodeOf(ExprKind::kGenerator, begin, mark);
}

void SyntaxReader::Impl::Clauses(bool takes_commas) {
  const bool takes_conditionals = takes_conditionals_;
  takes_conditionals_ = false;
  while (IsClause()) Clause(takes_commas);
  takes_conditionals_ = takes_conditionals;
}

// In the lists of Python 2 what is iterated may have commas.
void SyntaxReader::Impl::Clause(bool takes_commas) {
  const uint32_t begin = Begin();
  const bool is_async = Take(word::kAsync);
  const size_t mark = scratch_.size();
  Step();
  Push(Targets());
  if (!Take(word::kIn)) {
    Push(Missing());
  } else if (takes_commas) {
    Push(Expressions());
  } else {
    Push(Expression());
  }
  while (Take(word::kIf)) Push(Expression());
  const ExprId clause = NodeOf(ExprKind::kComprehensionFor, begin, mark);
  if (is_async) Flag(clause, kAsyncClause);
  Push(clause);
}

// ---- targets ----

// A value that is assigned.
ExprId SyntaxReader::Impl::Target() {
  const uint32_t begin = Begin();
  const bool is_starred = Take(tok::STAR);
  ExprId target = Primary();
  MarkTarget(target);
  if (is_starred) target = Node(ExprKind::kStarred, begin, {target});
  return target;
}

void SyntaxReader::Impl::MarkTarget(ExprId target) {
  if (target == kNoExpr) return;
  switch (out_->exprs[target].kind) {
    case ExprKind::kName:
    case ExprKind::kAttribute:
    case ExprKind::kSubscript:
    case ExprKind::kConstant:
      Flag(target, kIsTarget);
      break;
    case ExprKind::kTuple:
    case ExprKind::kList:
    case ExprKind::kStarred:
      for (const ExprId item : out_->ChildrenOf(target)) MarkTarget(item);
      break;
    default:
      break;
  }
}

}  // namespace quillet
