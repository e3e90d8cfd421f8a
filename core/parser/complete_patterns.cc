// Heads of match and case statements: subject, patterns, guard.
//
// Captures are leaves, and every group is a node of a pattern, so that a walk tells what is bound by the
// class alone; a dotted value is a chain as in any expression, which reads its links.
#include <algorithm>
#include <unordered_set>

#include "parser/complete_depth.h"
#include "parser/complete_parser.h"
#include "parser/key_literal.h"

namespace quillet {

namespace {
constexpr char kManyStars[] = "multiple starred names in sequence pattern";
}  // namespace

void CompleteParser::Match() {
  const size_t mark = Mark();
  RequireAt(at_, 10, "Pattern matching is");
  PushLeaf();
  Subject();
  if (AtEnd()) Fail("expected ':'");
  Expect(tok::COLON, nullptr);
  FinishBare<CMatchStmt>(mark);
}

void CompleteParser::Subject() {
  const size_t subject = Mark();
  // A lone star needs its comma.
  NamedOrStar();
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (!BeginsExpression(Code()) && Code() != tok::STAR) break;
    NamedOrStar();
  }
  Finish(symbols_.testlist_comp, subject);
  if (isa<CStarExpression>(Top())) FailHere();
}

void CompleteParser::Case() {
  const size_t mark = Mark();
  RequireAt(at_, 10, "Pattern matching is");
  PushLeaf();
  PatternsAndGuard();
  if (AtEnd()) Fail("expected ':'");
  Expect(tok::COLON, nullptr);
  if (!AtEnd()) SimpleStatement();
  captures_ = {};
  FinishBare<CCaseStmt>(mark);
}

void CompleteParser::PatternsAndGuard() {
  Patterns();
  if (irrefutable_ != kNowhere && Code() != word::kIf) irrefutable_words_ = UnreachableBehind(irrefutable_);
  if (Code() == word::kIf) {
    const size_t guard = Mark();
    PushLeaf();
    NamedTest();
    FinishBare<CNode>(guard);
  }
}

// What stands behind "case": one pattern, or a sequence without brackets.
void CompleteParser::Patterns() {
  const size_t mark = Mark();
  const size_t start = at_;
  const bool is_star = Code() == tok::STAR;
  int stars = is_star;
  MaybeStarPattern();
  if (Code() != tok::COMMA) {
    if (is_star) FailHere();
    // A node of its own, also around a lone capture: the walk of a pattern looks at what is in it.
    if (!isa<CPatternNode>(Top())) FinishBare<CPatternNode>(mark);
    return;
  }
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (Code() == tok::COLON || Code() == word::kIf) break;
    if (Code() == tok::STAR && ++stars == 2) Postpone(start, kManyStars, kCompiler);
    MaybeStarPattern();
  }
  irrefutable_ = kNowhere;
  FinishBare<CSequencePatternNode>(mark);
}

void CompleteParser::MaybeStarPattern() {
  if (Code() != tok::STAR) return AsPattern();
  const size_t mark = Mark();
  PushLeaf();
  if (!IsName(Code())) FailHere();
  CheckCapture(at_);
  PushLeaf();
  FinishBare<CPatternNode>(mark);
}

void CompleteParser::AsPattern() {
  const Deeper deeper(*this);
  const size_t mark = Mark();
  OrPattern();
  if (Code() != word::kAs) return;
  PushLeaf();
  const size_t name = at_;
  if (Code() == word::kUnderscore && CodeAt(1) != tok::DOT && CodeAt(1) != tok::LPAR)
    Fail("cannot use '_' as a target");
  if (!IsName(Code()) || CodeAt(1) == tok::DOT || CodeAt(1) == tok::LPAR || CodeAt(1) == tok::LSQB) {
    if (!Try([&] { Test(); })) FailGeneric(name);
    Test();
    FailAt(name, std::string("cannot use ") + NameOfExpression(Top()) + " as pattern target");
  }
  CheckCapture(name);
  PushLeaf();
  FinishBare<CPatternNode>(mark);
}

void CompleteParser::OrPattern() {
  const size_t mark = Mark();
  const size_t first_name = captures_.size();
  size_t alternatives = 1;
  const size_t start = at_;
  ClosedPattern();
  while (Code() == tok::VBAR) {
    // Only the last one may take whatever comes.
    if (irrefutable_ != kNowhere) Postpone(irrefutable_, UnreachableBehind(irrefutable_), kCompiler);
    const std::vector<Text> before = captures_.SortedFrom(first_name);
    captures_.Truncate(first_name);
    PushLeaf();
    ClosedPattern();
    ++alternatives;
    if (captures_.SortedFrom(first_name) != before)
      Postpone(start, "alternative patterns bind different names", kCompiler);
  }
  if (alternatives > 1) FinishBare<CPatternNode>(mark);
}

std::string CompleteParser::UnreachableBehind(size_t at) const {
  if (code_[at] == word::kUnderscore) return "wildcard makes remaining patterns unreachable";
  return "name capture '" + std::string(TokenAt(at).view()) + "' makes remaining patterns unreachable";
}

void CompleteParser::CheckCapture(size_t at) {
  const Text name = TokenAt(at).view();
  if (name == "_") return;
  if (!captures_.Add(name))
    Postpone(at, "multiple assignments to name '" + std::string(name) + "' in pattern", kCompiler);
}

void CompleteParser::ClosedPattern() {
  const Deeper deeper(*this);
  const size_t mark = Mark();
  irrefutable_ = kNowhere;
  switch (Code()) {
    case tok::NUMBER:
    case tok::MINUS:
      return NumberPattern();
    case tok::STRING:
      for (size_t at = at_; code_[at] == tok::STRING; ++at)
        if (TokenAt(at).view().find_first_of("fFtT") < TokenAt(at).view().find_first_of("\"'"))
          FailAt(at_, "patterns may only match literals and attribute lookups");
      return Strings();
    case word::kNone:
    case word::kTrue:
    case word::kFalse:
      return PushLeaf();
    case tok::LSQB:
      return SequencePattern(tok::RSQB);
    case tok::LPAR:
      return SequencePattern(tok::RPAR);
    case tok::LBRACE:
      return MappingPattern();
    default:
      break;
  }
  if (!IsName(Code())) FailHere();
  // The wildcard is nothing else.
  const bool is_wildcard = Code() == word::kUnderscore;
  if (is_wildcard || (CodeAt(1) != tok::DOT && CodeAt(1) != tok::LPAR)) {
    CheckCapture(at_);
    irrefutable_ = at_;
    return PushLeaf();
  }
  // A dotted value, or a class.
  DottedValue();
  if (Code() != tok::LPAR) return;
  PushLeaf();
  ClassArguments();
  irrefutable_ = kNowhere;
  FinishBare<CClassPatternNode>(mark);
}

void CompleteParser::DottedValue() {
  const size_t mark = Mark();
  PushLeaf();
  while (Code() == tok::DOT) {
    const size_t trailer = Mark();
    PushLeaf();
    PushName();
    Finish(symbols_.trailer, trailer);
  }
  Finish(symbols_.atom_expr, mark);
}

void CompleteParser::NumberPattern() {
  const size_t mark = Mark();
  if (Code() == tok::MINUS) PushLeaf();
  if (Code() != tok::NUMBER) return FailHere();
  const auto is_imaginary = [this] { return (TokenAt(at_).view().back() | 0x20) == 'j'; };
  const bool first_is_imaginary = is_imaginary();
  const size_t first = at_;
  PushLeaf();
  if (Code() == tok::PLUS || Code() == tok::MINUS) {
    PushLeaf();
    if (Code() != tok::NUMBER) return FailHere();
    if (first_is_imaginary) FailAt(first, "real number required in complex literal");
    if (!is_imaginary()) Fail("imaginary number required in complex literal");
    PushLeaf();
  }
  if (Mark() - mark > 1) FinishBare<CPatternNode>(mark);
}

// Behind the "(" up to and with the ")".
void CompleteParser::ClassArguments() {
  const InBracket in_bracket(*this);
  DistinctNames keywords;
  size_t last_positional = 0;
  bool is_misplaced = false;
  while (Code() != tok::RPAR) {
    if (IsName(Code()) && CodeAt(1) == tok::EQUAL) {
      const size_t mark = Mark();
      const Text name = TokenAt(at_).view();
      if (!keywords.Add(name))
        Postpone(at_, "attribute name repeated in class pattern: " + std::string(name), kCompiler);
      PushLeaf();
      PushLeaf();
      AsPattern();
      FinishBare<CClassArgumentPatternNode>(mark);
    } else {
      last_positional = at_;
      AsPattern();
      is_misplaced |= keywords.size() != 0;
    }
    if (Code() != tok::COMMA) break;
    PushLeaf();
  }
  if (Code() == tok::RPAR && is_misplaced) FailAt(last_positional, "positional patterns follow keyword patterns");
  Expect(tok::RPAR, nullptr);
}

// In brackets of either kind; round ones around one pattern alone only group it.
void CompleteParser::SequencePattern(TokenCode close) {
  const InBracket in_bracket(*this);
  const size_t mark = Mark();
  PushLeaf();
  bool has_comma = false;
  bool has_star = false;
  int stars = 0;
  const size_t start = at_;
  while (Code() != close) {
    has_star = Code() == tok::STAR;
    if (has_star && ++stars == 2) Postpone(start - 1, kManyStars, kCompiler);
    MaybeStarPattern();
    if (Code() != tok::COMMA) break;
    has_comma = true;
    PushLeaf();
  }
  if (close == tok::RPAR && has_star && !has_comma) FailHere();
  if (close != tok::RPAR || has_comma) irrefutable_ = kNowhere;
  Expect(close, nullptr);
  FinishBare<CSequencePatternNode>(mark);
}

void CompleteParser::MappingPattern() {
  const InBracket in_bracket(*this);
  const size_t mark = Mark();
  const size_t start = at_;
  PushLeaf();
  std::unordered_set<std::string> keys;
  while (Code() != tok::RBRACE) {
    if (Code() == tok::DOUBLESTAR) {
      PushLeaf();
      if (!IsName(Code())) FailHere();
      if (Code() == word::kUnderscore) FailHere();
      CheckCapture(at_);
      PushLeaf();
      if (Code() == tok::COMMA) PushLeaf();
      if (Code() != tok::RBRACE) FailHere();
      break;
    }
    // A key is a literal or a dotted value.
    if (IsName(Code()) && CodeAt(1) != tok::DOT) FailHere();
    if (Code() == tok::LPAR || Code() == tok::LSQB || Code() == tok::LBRACE) FailHere();
    const size_t key = at_;
    if (Code() == word::kUnderscore)
      DottedValue();
    else
      ClosedPattern();
    if (!failed_ && !IsName(code_[key])) {
      const auto first = static_cast<size_t>(index_[key]);
      const KeyLiteral literal(toks_.subspan(first, static_cast<size_t>(index_[at_]) - first));
      if (!keys.insert(literal.value()).second)
        Postpone(start, "mapping pattern checks duplicate key (" + literal.Shown() + ")", kCompiler);
    }
    if (isa<CClassPatternNode>(Top())) FailHere();
    Expect(tok::COLON, nullptr);
    AsPattern();
    if (Code() != tok::COMMA) break;
    PushLeaf();
  }
  Expect(tok::RBRACE, nullptr);
  irrefutable_ = kNowhere;
  FinishBare<CSequencePatternNode>(mark);
}

}  // namespace quillet
