// Patterns of `case`. Depth counts as in expressions.
#include "syntax/reader_impl.h"

namespace quillet {

// A sequence may stand without brackets.
ExprId SyntaxReader::Impl::Patterns() {
  const uint32_t begin = Begin();
  const ExprId first = Pattern();
  if (!Is(tok::COMMA)) {
    if (out_->exprs[first].kind != ExprKind::kPatternStar) return first;
    return Node(ExprKind::kPatternSequence, begin, {first});
  }
  const size_t mark = scratch_.size();
  Push(first);
  bool has_trailing_comma = false;
  while (!has_trailing_comma && Take(tok::COMMA)) {
    has_trailing_comma = !BeginsExpression();
    if (!has_trailing_comma) Push(Pattern());
  }
  return NodeOf(ExprKind::kPatternSequence, begin, mark);
}

ExprId SyntaxReader::Impl::Pattern() {
  const uint32_t begin = Begin();
  if (Is(tok::STAR) || Is(tok::DOUBLESTAR)) {
    Step();
    return StarPattern(begin);
  }
  ExprId pattern = OrPattern();
  while (Take(word::kAs)) {
    const ExprId name = IsName() ? Name() : Missing();
    MarkTarget(name);
    pattern = Node(ExprKind::kPatternAs, begin, {pattern, name});
  }
  return pattern;
}

ExprId SyntaxReader::Impl::OrPattern() {
  const uint32_t begin = Begin();
  const ExprId first = ClosedPattern();
  if (!Is(tok::VBAR)) return first;
  const size_t mark = scratch_.size();
  Push(first);
  while (Take(tok::VBAR)) Push(ClosedPattern());
  return NodeOf(ExprKind::kPatternOr, begin, mark);
}

ExprId SyntaxReader::Impl::ClosedPattern() {
  switch (Code()) {
    case tok::LPAR:
      return TooDeep() ? SkipBracket() : BracketPattern(tok::RPAR);
    case tok::LSQB:
      return TooDeep() ? SkipBracket() : BracketPattern(tok::RSQB);
    case tok::LBRACE:
      return TooDeep() ? SkipBracket() : MappingPattern();
    default:
      break;
  }
  if (IsName()) return NamePattern();
  const uint32_t begin = Begin();
  const ExprId value = Operators(kSumBinding);
  return Node(ExprKind::kPatternValue, begin, {value});
}

// A name alone is captured; one with a dot is a value, and one that is called is a class.
ExprId SyntaxReader::Impl::NamePattern() {
  const uint32_t begin = Begin();
  const TokenCode next = NextCode();
  if (next != tok::DOT && next != tok::LPAR && !IsTemplatePrefix(*place_.at)) {
    const ExprId capture = Add(ExprKind::kPatternCapture, begin, begin + place_.at->length);
    if (Is(word::kUnderscore)) {
      Step();
      SetNoName(capture);
    } else {
      SetName(capture, *place_.at);
      Step();
    }
    return capture;
  }
  if (IsTemplatePrefix(*place_.at)) return Node(ExprKind::kPatternValue, begin, {String()});
  ExprId value = Name();
  while (Is(tok::DOT)) value = Attribute(value, begin);
  if (!Is(tok::LPAR)) return Node(ExprKind::kPatternValue, begin, {value});
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  bool is_closed = false;
  Push(value);
  if (TooDeep()) {
    SkipBracket();
  } else {
    Level level(*this, tok::LPAR);
    is_closed = Items(tok::RPAR, tok::ENDMARKER, [this] { ClassArgument(); });
  }
  if (!is_closed) Fault();
  const ExprId pattern = NodeOf(ExprKind::kPatternClass, begin, mark);
  if (faults_ != faults) Flag(pattern, kIsBroken);
  return pattern;
}

void SyntaxReader::Impl::ClassArgument() {
  if (!IsName() || NextCode() != tok::EQUAL) return Push(Pattern());
  const uint32_t begin = Begin();
  const ExprId keyword = Add(ExprKind::kKeyword, begin, begin);
  SetName(keyword, *place_.at);
  place_.at += 2;
  const ExprId pattern = Pattern();
  SetChildren(keyword, {pattern});
  EndHere(keyword);
  Push(keyword);
}

// `*name`, behind the stars.
ExprId SyntaxReader::Impl::StarPattern(uint32_t begin) {
  const ExprId star = Add(ExprKind::kPatternStar, begin, LastEnd());
  if (!IsName() || Is(word::kUnderscore)) {
    if (!IsName()) Break(star);
    if (IsName()) Step();
    SetNoName(star);
  } else {
    SetName(star, *place_.at);
    Step();
  }
  EndHere(star);
  return star;
}

// A sequence, or one pattern in round brackets.
ExprId SyntaxReader::Impl::BracketPattern(TokenCode close) {
  const uint32_t begin = Begin();
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  bool has_trailing_comma = false;
  Level level(*this, Code());
  const bool is_closed = Items(
      close, tok::ENDMARKER, [this] { Push(Pattern()); }, &has_trailing_comma);
  if (!is_closed) Fault();
  ExprId pattern;
  const bool is_round = close == tok::RPAR;
  if (is_round && scratch_.size() == mark + 1 && !has_trailing_comma &&
      out_->exprs[scratch_.back()].kind != ExprKind::kPatternStar) {
    pattern = scratch_.back();
    scratch_.pop_back();
  } else {
    pattern = NodeOf(ExprKind::kPatternSequence, begin, mark);
  }
  if (is_round) Flag(pattern, kParenthesized);
  if (faults_ != faults) Flag(pattern, kIsBroken);
  return pattern;
}

ExprId SyntaxReader::Impl::MappingPattern() {
  const uint32_t begin = Begin();
  const uint32_t faults = faults_;
  const size_t mark = scratch_.size();
  Level level(*this, tok::LBRACE);
  const bool is_closed = Items(tok::RBRACE, tok::ENDMARKER, [this] {
    const uint32_t item_begin = Begin();
    if (Take(tok::DOUBLESTAR)) {
      Push(StarPattern(item_begin));
      return Push(kNoExpr);
    }
    Push(Operators(kSumBinding));
    Push(Take(tok::COLON) ? Pattern() : Missing());
  });
  if (!is_closed) Fault();
  const ExprId pattern = NodeOf(ExprKind::kPatternMapping, begin, mark);
  if (faults_ != faults) Flag(pattern, kIsBroken);
  return pattern;
}

}  // namespace quillet
