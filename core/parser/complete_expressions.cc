// Expressions of every version, by precedence climbing: a run of operators of one level is one flat node, as
// the tables make it.
//
// Where an expression ends and another begins inside of brackets, what is missing is a comma, and the
// failure stands at the first of the two. What only the compiler behind the language's parser rejects is
// postponed: an error of the grammar further on comes first.
#include <algorithm>

#include "foundations/errors.h"
#include "lines/fstring_fields.h"
#include "lines/token_search.h"
#include "parser/complete_depth.h"
#include "parser/complete_parser.h"
#include "parser/string_escapes.h"

namespace quillet {

namespace {

constexpr char kMixedTemplate[] = "cannot mix t-string literals with string or bytes literals";

enum Level : int {
  kOrLevel,
  kAndLevel,
  kNotLevel,
  kCompareLevel,
  kBitOrLevel,
  kXorLevel,
  kBitAndLevel,
  kShiftLevel,
  kArithLevel,
  kTermLevel,
  kNoLevel
};

bool IsBytesLiteral(Text text) {
  for (const char c : text) {
    if (c == '"' || c == '\'') return false;
    if ((c | 0x20) == 'b') return true;
  }
  return false;
}

}  // namespace

// ---- lists ----

void CompleteParser::TestOrStar() {
  if (Code() != tok::STAR) return Test();
  if (!Since(0)) FailHere();
  const size_t mark = Mark();
  PushLeaf();
  if (brackets_ > 0 && !BeginsExpression(Code())) Fail("Invalid star expression");
  Binary(kBitOrLevel);
  Finish(symbols_.star_expr, mark);
}

void CompleteParser::NamedOrStar() {
  if (Code() != tok::STAR) return NamedTest();
  if (!Since(5)) FailHere();
  TestOrStar();
}

void CompleteParser::StarExpressions(int symbol) {
  const size_t mark = Mark();
  TestOrStar();
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (!BeginsExpression(Code()) && Code() != tok::STAR) break;
    TestOrStar();
  }
  Finish(symbol, mark);
}

void CompleteParser::TargetList(TargetUse use) {
  const size_t mark = Mark();
  const size_t start = at_;
  const auto one = [this] {
    if (Code() != tok::STAR) return Binary(kBitOrLevel);
    if (!BeginsExpression(CodeAt(1))) FailGeneric(at_ + 1);
    TestOrStar();
  };
  one();
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (!BeginsExpression(Code() == tok::STAR ? CodeAt(1) : Code())) break;
    one();
  }
  Finish(symbols_.exprlist, mark);
  // A comparison in brackets is no target, and none that is told what it is instead.
  const bool is_other = InvalidTarget(Top(), use) == nullptr && InvalidTarget(Top(), TargetUse::kAssign) != nullptr;
  if (use != TargetUse::kFor || (Code() == word::kIn && !is_other)) {
    CheckTarget(Top(), use, false);
    if (isa<CStarExpression>(Top()))
      PostponeAtNode(Top(), "starred assignment target must be in a list or tuple", kCompiler);
    return;
  }
  // What a target may not be, such as a comparison, explains more than the missing word does.
  const size_t stopped = at_;
  at_ = start;
  {
    const RestoredValue<bool> trying(is_trying_, true);
    StarExpressions(symbols_.exprlist);
  }
  CheckTarget(Top(), use, false);
  if (comprehension_ != nullptr && python3_) FailAt(stopped, "'in' expected after for-loop variables");
  FailGeneric(stopped);
}

void CompleteParser::NamedTest() {
  const size_t mark = Mark();
  const size_t start = at_;
  Test();
  if (Code() == tok::COLONEQUAL) {
    if (!Since(8)) RequireAt(at_, 8, "Assignment expressions are");
    if (at_ != start + 1 || !IsName(code_[start])) FailAtAssigned();
    CheckWalrus(start);
    PushLeaf();
    Test();
    Finish(symbols_.namedexpr_test, mark);
  } else if (Code() == tok::EQUAL) {
    FailAtEqual(start, mark);
  }
}

// At the ":=" behind what is no name.
void CompleteParser::FailAtAssigned() {
  const bool is_assignment = Try([&] { Skip(), Test(); });
  if (!is_assignment) FailHere();
  FailAtNode(Top(), std::string("cannot use assignment expressions with ") + NameOfExpression(Top()));
}

// `if x = 1:` and `(f() = 1)`.
void CompleteParser::FailAtEqual(size_t start, size_t mark) {
  const CNode* left = nodes_[mark];
  const size_t equal = at_;
  const bool is_name = equal == start + 1 && IsName(code_[start]);
  const TokenCode first = code_[start];
  const bool is_excluded =
      first == word::kTrue || first == word::kFalse || first == word::kNone || IsBracketed(left) || !IsBitwiseOr(left);
  if (!is_name && is_excluded) FailGeneric(equal);
  const bool is_comparison = Try([&] {
    Skip();
    Binary(kBitOrLevel);
    if (Code() == tok::EQUAL || Code() == tok::COLONEQUAL) FailHere();
  });
  if (!is_comparison) FailGeneric(equal);
  if (is_name) FailAt(start, "invalid syntax. Maybe you meant '==' or ':=' instead of '='?");
  FailAtNode(left,
             std::string("cannot assign to ") + NameOfExpression(left) + " here. Maybe you meant '==' instead of '='?");
}

// ---- tests and operators ----

void CompleteParser::Test() {
  const Deeper deeper(*this);
  if (Code() == word::kLambda) return Lambda();
  const size_t mark = Mark();
  const size_t start = at_;
  Binary(kOrLevel);
  if (Code() != word::kIf) {
    if (BeginsExpression(Code())) [[unlikely]]
      CheckBetween(start, mark);
    return;
  }
  const size_t end = end_;
  PushLeaf();
  Binary(kOrLevel);
  if (Code() != word::kElse) {
    if (!failed_) end_ = end;
    if (Code() == tok::COLON) FailHere();
    FailAtNode(nodes_[mark], "expected 'else' after 'if' expression");
  }
  PushLeaf();
  if (python3_ && !BeginsExpression(Code())) Fail("expected expression after 'else', but statement is given");
  Test();
  Finish(symbols_.test, mark);
}

void CompleteParser::CheckBetween(size_t start, size_t mark) {
  if (is_trying_) return;
  const size_t second = at_;
  const TokenCode first = code_[start];
  const bool is_legacy = python3_ && second == start + 1 && (first == word::kPrint || first == word::kExec);
  const bool is_soft =
      first == word::kMatch || first == word::kCase || first == word::kUnderscore || first == word::kType;
  const bool is_prefix = IsNameCode(first) && code_[start + 1] == tok::STRING;
  if (!is_legacy && (is_soft || is_prefix)) return;
  if (is_legacy && Try([&] { StarExpressions(symbols_.testlist_star_expr); })) {
    const std::string name(TokenAt(start).view());
    FailAt(start, "Missing parentheses in call to '" + name + "'. Did you mean " + name + "(...)?");
  }
  if (is_legacy) return;
  if (python3_ && first == tok::STRING && code_[start + 1] != tok::STRING) {
    size_t behind = start + 1;
    do behind = EndOfExpression(behind);
    while (behind != kNowhere && code_[behind] != tok::STRING);
    if (behind != kNowhere) FailAt(start + 1, "invalid syntax. Is this intended to be part of the string?");
  }
  if (EndOfExpression(second) == kNowhere) return;
  if (brackets_ > 0) FailAtNode(nodes_[mark], "invalid syntax. Perhaps you forgot a comma?");
  // Where they stand in no brackets the second one may say more.
  const bool says_more = code_[second] == word::kPrint || code_[second] == word::kExec || code_[second] == tok::STRING;
  if (!python3_ || !says_more || !BeginsExpression(code_[second + 1])) return;
  Skip();
  CheckBetween(second, mark);
}

// As far as one can be read, whatever follows.
size_t CompleteParser::EndOfExpression(size_t from) {
  const size_t start = at_;
  const RestoredValue<int> level(end_level_, brackets_);
  const RestoredValue<size_t> end(end_, kNowhere);
  at_ = from;
  Try([this] {
    Test();
    if (!failed_) end_ = at_;
  });
  at_ = start;
  return end_;
}

// The condition of a comprehension in front of 3.9.
void CompleteParser::OldTest() {
  if (Code() == word::kLambda && !Since(9)) return Lambda();
  Binary(kOrLevel);
}

void CompleteParser::Lambda() {
  const Deeper deeper(*this, 2);
  const size_t mark = Mark();
  PushLeaf();
  const RestoredValue<const char*> comprehension(comprehension_, nullptr);
  // Defaults belong to what the function stands in.
  if (Code() != tok::COLON) Parameters(/*is_lambda=*/true, tok::COLON);
  Expect(tok::COLON, nullptr);
  const RestoredValue<StatementPlace> place(place_, {StatementPlace::Scope::kFunction});
  const RestoredValue<const char*> type_scope(type_scope_, nullptr);
  const size_t outer_waits = waits_.size();
  const size_t body = at_;
  Test();
  JudgeWaits(outer_waits);
  DropBanned(body);
  yield_at_ = kNowhere;
  Finish(symbols_.lambdef, mark);
}

int CompleteParser::LevelOf(TokenCode code) const {
  switch (code) {
    case word::kOr:
      return kOrLevel;
    case word::kAnd:
      return kAndLevel;
    case word::kNot:
      return CodeAt(1) == word::kIn ? kCompareLevel : kNoLevel;
    case word::kIn:
    case word::kIs:
    case tok::LESS:
    case tok::GREATER:
    case tok::EQEQUAL:
    case tok::NOTEQUAL:
    case tok::LESSEQUAL:
    case tok::GREATEREQUAL:
      return kCompareLevel;
    case tok::VBAR:
      return kBitOrLevel;
    case tok::CIRCUMFLEX:
      return kXorLevel;
    case tok::AMPER:
      return kBitAndLevel;
    case tok::LEFTSHIFT:
    case tok::RIGHTSHIFT:
      return kShiftLevel;
    case tok::PLUS:
    case tok::MINUS:
      return kArithLevel;
    case tok::STAR:
    case tok::SLASH:
    case tok::PERCENT:
    case tok::DOUBLESLASH:
    case tok::AT:
      return kTermLevel;
    default:
      return kNoLevel;
  }
}

// The operator at the front, which is of the level.
void CompleteParser::Operator(int level) {
  if (level != kCompareLevel) {
    if (Code() == tok::AT && !Since(5)) RequireAt(at_, 5, "The '@' operator is");
    return PushLeaf();
  }
  const size_t mark = Mark();
  if (Code() == tok::NOTEQUAL && python3_ && TokenAt(at_).view() == "<>")
    Fail("invalid syntax.  Maybe you meant '!=' instead of '<>'?");
  const TokenCode code = Code();
  PushLeaf();
  if (code == word::kNot || (code == word::kIs && Code() == word::kNot)) {
    PushLeaf();
    Finish(symbols_.comp_op, mark);
  }
}

void CompleteParser::Binary(int level) {
  const Deeper deeper(*this);
  const int symbols[] = {symbols_.or_test,  symbols_.and_test, symbols_.not_test,   symbols_.comparison, symbols_.expr,
                         symbols_.xor_expr, symbols_.and_expr, symbols_.shift_expr, symbols_.arith_expr, symbols_.term};
  const size_t mark = Mark();
  if (Code() == word::kNot && level <= kNotLevel) {
    PushLeaf();
    Binary(kNotLevel);
    Finish(symbols_.not_test, mark);
  } else {
    Factor();
  }
  for (int next; (next = LevelOf(Code())) >= level && next != kNoLevel;) {
    do {
      Operator(next);
      Binary(next + 1);
    } while (LevelOf(Code()) == next);
    Finish(symbols[next], mark);
  }
}

void CompleteParser::Factor() {
  if (Code() != tok::PLUS && Code() != tok::MINUS && Code() != tok::TILDE) return Power();
  const Deeper deeper(*this);
  const size_t mark = Mark();
  PushLeaf();
  Factor();
  Finish(symbols_.factor, mark);
}

void CompleteParser::Power() {
  const size_t mark = Mark();
  AtomExpression();
  if (Code() != tok::DOUBLESTAR) return;
  PushLeaf();
  Factor();
  Finish(symbols_.power, mark);
}

void CompleteParser::AtomExpression() {
  const size_t mark = Mark();
  if (Code() == word::kAwait && IsKeyword(word::kAwait)) {
    waits_.push_back({at_, /*is_comprehension=*/false});
    PushLeafOf(tok::AWAIT, TokenAt(at_), index_[at_]);
    Skip();
  }
  Atom();
  NoteEnd();
  while (Code() == tok::DOT || Code() == tok::LPAR || Code() == tok::LSQB) {
    Trailer();
    NoteEnd();
  }
  Finish(symbols_.atom_expr, mark);
}

void CompleteParser::Trailer() {
  const size_t mark = Mark();
  if (Code() == tok::DOT) {
    PushLeaf();
    PushName();
  } else if (Code() == tok::LPAR) {
    PushLeaf();
    const InBracket in_bracket(*this);
    if (Code() != tok::RPAR) Arguments();
    Expect(tok::RPAR, nullptr);
  } else {
    PushLeaf();
    const InBracket in_bracket(*this);
    Subscripts();
    Expect(tok::RSQB, nullptr);
  }
  Finish(symbols_.trailer, mark);
}

// ---- atoms ----

void CompleteParser::Atom() {
  switch (Code()) {
    case tok::NUMBER:
      return PushLeaf();
    case tok::STRING:
      return Strings();
    case tok::LPAR:
      return Group();
    case tok::LSQB:
      return ListDisplay();
    case tok::LBRACE:
      return DictOrSet();
    case tok::BACKQUOTE:
      if (python3_) FailHere();
      return Backquotes();
    case tok::ELLIPSIS:
      if (!python3_) FailHere();
      return PushLeaf();
    case word::kNone:
    case word::kTrue:
    case word::kFalse:
      return PushLeaf();
    default:
      if (!IsName(Code())) FailAtNoExpression();
      if (CodeAt(1) == tok::STRING && Since(14) && IsTemplateString(TokenAt(at_), TokenAt(at_ + 1))) return Templates();
      return PushLeaf();
  }
}

void CompleteParser::FailAtNoExpression() {
  if (Code() == word::kPass || Code() == word::kBreak || Code() == word::kContinue) {
    if (CodeAt(1) == word::kIf && python3_) Fail("expected expression before 'if', but statement is given");
    // The language looks at what follows.
    furthest_ = std::max(furthest_, at_ + 1);
  }
  FailHere();
}

void CompleteParser::Strings() {
  const size_t mark = Mark();
  const bool is_bytes = IsBytesLiteral(TokenAt(at_).view());
  bool is_mixed = false;
  while (Code() == tok::STRING) {
    is_mixed |= IsBytesLiteral(TokenAt(at_).view()) != is_bytes;
    if (std::string wrong = WrongEscape(TokenAt(at_).view(), python3_); !wrong.empty()) Fail(std::move(wrong));
    PushLeaf();
  }
  if (Since(14) && Code() == tok::NAME && CodeAt(1) == tok::STRING && IsTemplateString(TokenAt(at_), TokenAt(at_ + 1)))
    FailAt(at_ - 1, kMixedTemplate);
  if (is_mixed && python3_) Fail("cannot mix bytes and nonbytes literals");
  Finish(symbols_.atom, mark);
}

// Side by side they are one template. It is no string: a leaf of its own, of which nothing is known.
void CompleteParser::Templates() {
  const size_t mark = Mark();
  met_template_ = true;
  while (Code() == tok::NAME && CodeAt(1) == tok::STRING && IsTemplateString(TokenAt(at_), TokenAt(at_ + 1))) {
    const Token& prefix = TokenAt(at_);
    const Text text(prefix.text, static_cast<size_t>(TokenAt(at_ + 1).end() - prefix.text));
    if (std::string wrong = WrongEscape(text, python3_); !wrong.empty()) Fail(std::move(wrong));
    nodes_.push_back(factory_.NewKeywordNode(text, Context::Index(index_[at_])));
    Skip();
    Skip();
  }
  if (Code() == tok::STRING) FailAt(at_ - 2, kMixedTemplate);
  if (Mark() - mark > 1) FinishBare<CExpression>(mark);
}

void CompleteParser::Group() {
  const Deeper deeper(*this);
  const InBracket in_bracket(*this);
  const size_t mark = Mark();
  PushLeaf();
  if (Code() == word::kYield) {
    Yield();
  } else if (Code() != tok::RPAR) {
    const size_t inner = Mark();
    const size_t start = at_;
    if (Code() == tok::DOUBLESTAR && python3_) {
      Skip();
      Binary(kBitOrLevel);
      if (Code() == tok::RPAR) FailAt(start, "cannot use double starred expression here");
      FailGeneric(start);
    }
    NamedOrStar();
    if (IsComprehension()) {
      if (code_[start] == tok::STAR) FailAt(start, "iterable unpacking cannot be used in comprehension");
      Comprehension("generator expression", start);
    } else {
      if (code_[start] == tok::STAR && Code() == tok::RPAR && !IsElement(start - 1, at_))
        FailAt(start, "cannot use starred expression here");
      Elements(tok::RPAR);
    }
    Finish(symbols_.testlist_comp, inner);
  }
  Expect(tok::RPAR, nullptr);
  Finish(symbols_.atom, mark);
}

// In front of 3.9 brackets around a starred element changed nothing. Whether those two stand around an element.
bool CompleteParser::IsElement(size_t open, size_t close) const {
  if (!Since(5) || Since(9)) return false;
  const TokenCode behind = code_[close + 1];
  if (behind == tok::COMMA) return true;
  const TokenCode before = open > 0 ? code_[open - 1] : tok::ENDMARKER;
  return IsClosingBracket(behind) && (IsOpeningBracket(before) || before == tok::COMMA);
}

// The elements behind the first one.
void CompleteParser::Elements(TokenCode close) {
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (Code() == close) return;
    NamedOrStar();
  }
}

bool CompleteParser::IsComprehension() const {
  return Code() == word::kFor || (Code() == word::kAsync && CodeAt(1) == word::kFor);
}

void CompleteParser::ListDisplay() {
  const Deeper deeper(*this);
  const InBracket in_bracket(*this);
  const size_t mark = Mark();
  PushLeaf();
  if (Code() != tok::RSQB) {
    const size_t inner = Mark();
    const size_t start = at_;
    NamedOrStar();
    if (IsComprehension()) {
      if (code_[start] == tok::STAR) FailAt(start, "iterable unpacking cannot be used in comprehension");
      Comprehension("list comprehension", start);
    } else {
      Elements(tok::RSQB);
      if (IsComprehension()) FailAtTarget(start);
    }
    Finish(symbols_.testlist_comp, inner);
  }
  Expect(tok::RSQB, nullptr);
  Finish(symbols_.atom, mark);
}

// `[a, b for a, b in c]`
void CompleteParser::FailAtTarget(size_t start) {
  if (!python3_ || !Try([&] { Comprehension("comprehension", start); })) FailHere();
  FailAt(start, "did you forget parentheses around the comprehension target?");
}

void CompleteParser::DictOrSet() {
  const Deeper deeper(*this);
  const InBracket in_bracket(*this);
  const size_t mark = Mark();
  PushLeaf();
  if (Code() != tok::RBRACE) {
    const size_t inner = Mark();
    const size_t start = at_;
    const bool is_unpacked = Code() == tok::DOUBLESTAR;
    bool is_dict = is_unpacked;
    if (is_unpacked) {
      if (!Since(5)) FailHere();
      PushLeaf();
      Binary(kBitOrLevel);
    } else if (Code() == tok::STAR) {
      NamedOrStar();
    } else {
      NamedTest();
      is_dict = Code() == tok::COLON;
      if (is_dict) DictValue();
    }
    if (IsComprehension()) {
      if (is_unpacked) FailAt(start, "dict unpacking cannot be used in dict comprehension");
      if (code_[start] == tok::STAR) FailAt(start, "iterable unpacking cannot be used in comprehension");
      Comprehension(is_dict ? "dict comprehension" : "set comprehension", start);
    } else if (is_dict) {
      while (Code() == tok::COMMA) {
        PushLeaf();
        if (Code() == tok::RBRACE) break;
        if (Code() == tok::DOUBLESTAR) {
          if (!Since(5)) FailHere();
          PushLeaf();
          Binary(kBitOrLevel);
        } else {
          Test();
          if (Code() != tok::COLON) {
            if (Code() == tok::COMMA || Code() == tok::RBRACE) FailAt(at_ - 1, "':' expected after dictionary key");
            FailHere();
          }
          DictValue();
        }
      }
    } else {
      Elements(tok::RBRACE);
      if (IsComprehension()) FailAtTarget(start);
    }
    Finish(symbols_.dictorsetmaker, inner);
  }
  Expect(tok::RBRACE, nullptr);
  Finish(symbols_.atom, mark);
}

// The colon of a pair and the value behind it.
void CompleteParser::DictValue() {
  const size_t colon = at_;
  PushLeaf();
  if (Code() == tok::RBRACE || Code() == tok::COMMA) {
    if (python3_) FailAt(colon, "expression expected after dictionary key and ':'");
    FailHere();
  }
  if (Code() == tok::STAR) FailAt(at_, "cannot use a starred expression in a dictionary value");
  Test();
}

void CompleteParser::Backquotes() {
  const Deeper deeper(*this);
  const size_t mark = Mark();
  PushLeaf();
  const size_t inner = Mark();
  Test();
  while (Code() == tok::COMMA) {
    PushLeaf();
    Test();
  }
  Finish(symbols_.testlist_star_expr, inner);
  Expect(tok::BACKQUOTE, nullptr);
  Finish(symbols_.atom, mark);
}

// ---- arguments and subscripts ----

void CompleteParser::Arguments(bool is_of_class) {
  const size_t mark = Mark();
  DistinctNames keywords;
  bool has_keyword = false;
  bool has_unpacked_keywords = false;
  bool has_star = false;
  size_t count = 0;
  size_t generator = kNowhere;
  size_t generator_for = kNowhere;
  while (Code() != tok::RPAR) {
    const size_t start = at_;
    const size_t argument = Mark();
    ++count;
    if (!python3_ && has_unpacked_keywords) FailHere();
    if (Code() == tok::STAR || Code() == tok::DOUBLESTAR) {
      const bool is_star = Code() == tok::STAR;
      if (is_star && has_unpacked_keywords)
        FailAt(start, "iterable argument unpacking follows keyword argument unpacking");
      (is_star ? has_star : has_unpacked_keywords) = true;
      PushLeaf();
      if (is_star && python3_ && !BeginsExpression(Code())) Fail("Invalid star expression");
      Test();
      if (Code() == tok::EQUAL) {
        FailAt(start, is_star ? "cannot assign to iterable argument unpacking"
                              : "cannot assign to keyword argument unpacking");
      }
      Finish(symbols_.argument, argument);
    } else if (CodeAt(1) == tok::EQUAL && IsNameCode(Code())) {
      if (python3_ && (Code() == word::kTrue || Code() == word::kFalse || Code() == word::kNone))
        Fail("cannot assign to " + std::string(TokenAt(at_).view()));
      if (!python3_ && Code() == word::kNone) Fail("cannot assign to None");
      if (!IsName(Code())) FailHere();
      const Text name = TokenAt(at_).view();
      if (!keywords.Add(name)) Postpone(at_, "keyword argument repeated: " + std::string(name), kCompiler);
      if (name == "__debug__") Postpone(at_, "cannot assign to __debug__", kCompiler);
      has_keyword = true;
      PushLeaf();
      PushLeaf();
      if (Code() == tok::COMMA || Code() == tok::RPAR) {
        if (python3_) FailAt(start, "expected argument value expression");
        FailHere();
      }
      Test();
      if (IsComprehension() && python3_) FailAt(start, "invalid syntax. Maybe you meant '==' or ':=' instead of '='?");
      Finish(symbols_.argument, argument);
    } else {
      Test();
      if (Code() == tok::COLONEQUAL) {
        if (!Since(8)) RequireAt(at_, 8, "Assignment expressions are");
        if (at_ != start + 1 || !IsName(code_[start])) FailHere();
        CheckWalrus(start);
        PushLeaf();
        Test();
        if (Since(9) && IsComprehension()) {
          Finish(symbols_.namedexpr_test, argument);
          generator_for = at_;
          Comprehension("generator expression", start);
          if (generator == kNowhere) generator = start;
        }
        Finish(symbols_.argument, argument);
        if (has_unpacked_keywords || has_keyword) FailPositional(has_unpacked_keywords);
      } else if (IsComprehension()) {
        generator_for = at_;
        Comprehension("generator expression", start);
        Finish(symbols_.argument, argument);
        if (generator == kNowhere) generator = start;
      } else if (Code() == tok::EQUAL) {
        const bool was_taken = !Since(8) && isa<CAtom>(Top()) && IsNameInBrackets(Top());
        if (!was_taken) FailAtNode(Top(), "expression cannot contain assignment, perhaps you meant \"==\"?");
        has_keyword = true;
        PushLeaf();
        Test();
        Finish(symbols_.argument, argument);
      } else if (has_unpacked_keywords || has_keyword) {
        if (Code() != tok::COMMA && Code() != tok::RPAR) FailHere();
        FailPositional(has_unpacked_keywords);
      } else if (has_star && !Since(5)) {
        FailAt(start, "only named arguments may follow *expression");
      }
    }
    if (Code() != tok::COMMA) break;
    PushLeaf();
    if (generator != kNowhere && (Code() != tok::RPAR || Since(7)))
      FailAt(generator, "Generator expression must be parenthesized");
  }
  // It is no list of bases.
  if (generator != kNowhere && is_of_class && count == 1 && Since(7) && Code() == tok::RPAR) FailGeneric(generator_for);
  if (generator != kNowhere && count > 1) FailAt(generator, "Generator expression must be parenthesized");
  Finish(symbols_.arglist, mark);
}

// A positional argument behind a keyword: the language's parser says so where the arguments end.
void CompleteParser::FailPositional(bool behind_unpacked) {
  size_t place = at_;
  int depth = 0;
  for (; place + 1 < code_.size(); ++place) {
    const TokenCode code = code_[place];
    if (code == tok::LPAR || code == tok::LSQB || code == tok::LBRACE) ++depth;
    if (code == tok::RPAR || code == tok::RSQB || code == tok::RBRACE) {
      if (depth == 0) break;
      --depth;
    }
  }
  FailAt(place, behind_unpacked ? "positional argument follows keyword argument unpacking"
                                : "positional argument follows keyword argument");
}

void CompleteParser::Subscripts() {
  const size_t mark = Mark();
  Subscript();
  while (Code() == tok::COMMA) {
    PushLeaf();
    if (Code() == tok::RSQB) break;
    Subscript();
  }
  Finish(symbols_.subscriptlist, mark);
}

void CompleteParser::Subscript() {
  const size_t mark = Mark();
  if (Code() == tok::STAR) {
    // Unlike the one in a list it takes all that an expression is.
    if (!Since(11)) FailHere();
    PushLeaf();
    if (!BeginsExpression(Code())) Fail("Invalid star expression");
    Test();
    return Finish(symbols_.star_expr, mark);
  }
  if (!python3_ && Code() == tok::ELLIPSIS) return PushLeaf();
  if (Code() != tok::COLON) {
    const size_t start = at_;
    Test();
    if (Code() == tok::COLONEQUAL) {
      RequireAt(at_, 10, "Assignment expressions in subscripts are");
      if (at_ != start + 1 || !IsName(code_[start])) FailAtAssigned();
      CheckWalrus(start);
      PushLeaf();
      Test();
      return Finish(symbols_.namedexpr_test, mark);
    }
    if (Code() == tok::EQUAL) FailAtEqual(start, mark);
    if (Code() != tok::COLON) return;
  }
  PushLeaf();
  if (Code() != tok::COLON && Code() != tok::COMMA && Code() != tok::RSQB) Test();
  if (Code() == tok::COLON) {
    const size_t step = Mark();
    PushLeaf();
    if (Code() != tok::COMMA && Code() != tok::RSQB) Test();
    Finish(symbols_.sliceop, step);
  }
  Finish(symbols_.subscript, mark);
}

// ---- comprehensions ----

void CompleteParser::Comprehension(const char* what, size_t start) {
  if (yield_at_ != kNowhere && yield_at_ >= start && Since(8))
    Postpone(yield_at_, std::string("'yield' inside ") + what);
  const RestoredValue<const char*> comprehension(comprehension_, what);
  const size_t outer_names = iterated_.size();
  const RestoredValue<bool> has_async_for(has_async_for_, false);
  const RestoredValue<size_t> first_iterable_begin(first_iterable_begin_, 0);
  const RestoredValue<size_t> first_iterable_end(first_iterable_end_, 0);
  ComprehensionTail(/*is_first=*/true);
  TakeWaits(start);
  const auto is_within = [start](size_t at) { return at >= start; };
  CheckAssignedWithin(
      static_cast<size_t>(std::find_if(assigned_.begin(), assigned_.end(), is_within) - assigned_.begin()));
  iterated_.resize(outer_names);
  DropBanned(start);
}

void CompleteParser::DropBanned(size_t start) {
  std::erase_if(banned_, [&](const Banned& banned) {
    return banned.at >= start && (banned.at < first_iterable_begin_ || banned.at >= first_iterable_end_);
  });
}

// What waits in the comprehension that was read, from `start` on, makes it asynchronous; what is in its first
// iterable belongs to what is around it.
void CompleteParser::TakeWaits(size_t start) {
  bool is_async = has_async_for_;
  std::erase_if(waits_, [&](const Wait& wait) {
    if (wait.at < start || (wait.at >= first_iterable_begin_ && wait.at < first_iterable_end_)) return false;
    if (wait.is_comprehension) {
      if (!Since(11)) Postpone(wait.at, kAsyncComprehensionOutside, kCompiler);
    } else if (!Since(7) && !place_.is_in_async()) {
      return false;
    }
    is_async = true;
    return true;
  });
  const bool is_generator = comprehension_[0] == 'g';
  // The bracket in front of it is its place.
  if (is_async && !(is_generator && Since(7))) waits_.push_back({start - 1, /*is_comprehension=*/true});
}

// What waits in no comprehension, behind the first so many, waits in the function around it.
void CompleteParser::JudgeWaits(size_t first) {
  for (size_t i = first; i < waits_.size() && !place_.is_in_async(); ++i) {
    if (waits_[i].is_comprehension)
      Postpone(waits_[i].at, kAsyncComprehensionOutside, kCompiler);
    else if (place_.scope == StatementPlace::Scope::kFunction)
      Postpone(waits_[i].at, "'await' outside async function");
    else
      Postpone(waits_[i].at, "'await' outside function");
  }
  waits_.resize(first);
}

// The names assigned to from the `first` on stand in the comprehension that was read.
void CompleteParser::CheckAssignedWithin(size_t first) {
  std::string type_scope;
  if (type_scope_ == kGeneric || (type_scope_ != nullptr && in_generic_))
    type_scope = std::string("within ") + kGeneric;
  else if (type_scope_ != nullptr && type_scope_ != kAnnotation)
    type_scope = std::string("in ") + (type_scope_ == kAlias ? kAlias : kBound);
  for (size_t i = first; i < assigned_.size(); ++i) {
    const Text name = TokenAt(assigned_[i]).view();
    const bool is_iterated = assigned_[i] >= first_iterable_begin_ && assigned_[i] < first_iterable_end_;
    if (!type_scope.empty() && !is_iterated)
      Postpone(assigned_[i], "assignment expression within a comprehension cannot be used " + type_scope);
    if (place_.scope == StatementPlace::Scope::kClass)
      Postpone(assigned_[i], "assignment expression within a comprehension cannot be used in a class body");
    if (std::find(iterated_.begin(), iterated_.end(), name) != iterated_.end()) {
      Postpone(assigned_[i],
               "assignment expression cannot rebind comprehension iteration variable '" + std::string(name) + "'");
    }
  }
}

// The names of a target from `target` on: what an assignment in it, or in a condition in front of it, binds.
void CompleteParser::CheckRebound(size_t target, bool is_first) {
  const auto tell = [this](size_t at) {
    Postpone(at, "comprehension inner loop cannot rebind assignment expression target '" +
                     std::string(TokenAt(at).view()) + "'");
  };
  for (const size_t name : assigned_) {
    if (name >= target) tell(name);
    if (is_first || name < first_iterable_end_) continue;
    for (size_t at = target; at < at_; ++at)
      if (TokenAt(at).view() == TokenAt(name).view() &&
          std::ranges::any_of(iterated_, [&](Text text) { return text.data() == TokenAt(at).text; }))
        tell(at);
  }
}

void CompleteParser::AddIterated(const CNode* target) {
  if (isa<CNameLiteral>(target)) iterated_.push_back(target->fText());
  if (!isa<CTestListStarExpr>(target) && !isa<CAtom>(target) && !isa<CStarExpression>(target)) return;
  for (const CNode* child : target->fChildren()) AddIterated(child);
}

void CompleteParser::ComprehensionTail(bool is_first) {
  const Deeper deeper(*this);
  const size_t mark = Mark();
  if (Code() == word::kAsync) {
    if (!Since(6)) FailHere();
    if (!IsKeyword(word::kAsync)) FailHere();
    has_async_for_ = true;
    PushLeafOf(tok::ASYNC, TokenAt(at_), index_[at_]);
    Skip();
  }
  const size_t clause = Mark();
  PushLeaf();
  const size_t target = at_;
  TargetList(TargetUse::kFor);
  AddIterated(Top());
  CheckRebound(target, is_first);
  PushLeaf();
  const bool is_list = !python3_ && comprehension_[0] == 'l';
  {
    const RestoredValue<bool> in_iterable(in_iterable_, true);
    // The first iterable is none of the comprehension's own.
    const RestoredValue<const char*> comprehension(comprehension_, is_first ? nullptr : comprehension_);
    const size_t begin = at_;
    if (is_list) {
      const size_t iterable = Mark();
      OldTest();
      while (Code() == tok::COMMA) {
        PushLeaf();
        if (!BeginsExpression(Code())) break;
        OldTest();
      }
      Finish(symbols_.testlist_star_expr, iterable);
    } else {
      Binary(kOrLevel);
    }
    if (is_first) {
      first_iterable_begin_ = begin;
      first_iterable_end_ = at_;
    }
  }
  ComprehensionRest();
  Finish(symbols_.sync_comp_for, clause);
  Finish(symbols_.comp_for, mark);
}

void CompleteParser::ComprehensionRest() {
  if (IsComprehension()) return ComprehensionTail(/*is_first=*/false);
  if (Code() != word::kIf) {
    if (BeginsExpression(Code()) && brackets_ > 0) FailHere();
    return;
  }
  const Deeper deeper(*this);
  const size_t mark = Mark();
  PushLeaf();
  OldTest();
  ComprehensionRest();
  Finish(symbols_.comp_if, mark);
}

// ---- yield, assignment expressions ----

void CompleteParser::Yield() {
  const size_t mark = Mark();
  const size_t start = at_;
  using Scope = StatementPlace::Scope;
  yield_at_ = start;
  if (type_scope_ != nullptr) banned_.push_back({start, "yield expression"});
  if (comprehension_ != nullptr && Since(8))
    Postpone(start, std::string("'yield' inside ") + comprehension_);
  else if (place_.scope == Scope::kModule || place_.scope == Scope::kClass)
    Postpone(start, "'yield' outside function", kCompiler);
  else if (place_.is_in_async() && !Since(6))
    Postpone(start, "'yield' inside async function", kCompiler);
  PushLeaf();
  if (Code() == word::kFrom) {
    if (!Since(3)) FailHere();
    if (place_.is_in_async()) Postpone(start, "'yield from' inside async function", kCompiler);
    const size_t argument = Mark();
    PushLeaf();
    Test();
    Finish(symbols_.yield_arg, argument);
  } else if (BeginsExpression(Code()) || Code() == tok::STAR) {
    StarExpressions(symbols_.testlist_star_expr);
    if (!Since(8)) CheckNoStars(Top());
    CheckNoLoneStar(Top());
  }
  Finish(symbols_.yield_expr, mark);
}

void CompleteParser::CheckWalrus(size_t name) {
  assigned_.push_back(name);
  if (type_scope_ != nullptr) banned_.push_back({name, "named expression"});
  const bool is_in_type_scope_itself = type_scope_ != nullptr && comprehension_ == nullptr;
  if (in_iterable_ && !is_in_type_scope_itself)
    Postpone(name, "assignment expression cannot be used in a comprehension iterable expression");
  if (TokenAt(name).view() == "__debug__") Postpone(name, "cannot assign to __debug__", kCompiler);
}

}  // namespace quillet
