// Patterns: the run of tokens behind `case`, split from the outside in.
//
// Nothing is consumed. Each operation finds the structure of its whole range by searches outside of
// brackets and descends into sub-ranges; the order of the tests in NodeForPattern decides
// precedence. The token at the end of a range always exists (a colon, a comma, a bar, a closing
// bracket), and a group looks at it. A failure is a ParseError at the index named, and left parts are
// parsed first, so the leftmost error wins.
#include "foundations/errors.h"
#include "parser/match_case_parser.h"

namespace quillet {

class CMatchCaseStatementParser::Level {
 public:
  Level(CMatchCaseStatementParser* parser, int64_t bracket_i) : parser_(parser) {
    if (parser->depth_ >= kMaxPatternDepth) throw parser->ParseExceptionAt(bracket_i);
    ++parser->depth_;
  }
  Level(const Level&) = delete;
  Level& operator=(const Level&) = delete;
  ~Level() { --parser_->depth_; }

 private:
  CMatchCaseStatementParser* parser_;
};

CNode* CMatchCaseStatementParser::NodeForPattern(int64_t start, int64_t end, bool allow_as) {
  const size_t mark = Mark();

  // `as` binds loosest. Its name may be any name token, a keyword included.
  if (allow_as && start + 2 < end && Is(end - 2, word::kAs)) {
    Push(NodeForPattern(start, end - 2, false));
    if (!IsNameCode(At(end - 1).code)) throw ParseExceptionAt(end - 1);
    Push(TokNode(end - 2));
    Push(TokNode(end - 1));
    return Finish<CPatternNode>(mark);
  }

  // Alternatives, in one flat list. A bar at the end just ends it.
  int64_t bar_i = FindCode(tok::VBAR, start, end);
  if (bar_i >= 0) {
    for (int64_t i = start; i < end;) {
      const int64_t stop = bar_i >= 0 ? bar_i : end;
      Push(NodeForPattern(i, stop, false));
      if (bar_i >= 0) Push(TokNode(bar_i));
      i = stop + 1;
      bar_i = FindCode(tok::VBAR, i, end);
    }
    return Finish<CPatternNode>(mark);
  }

  const TokenCode code = At(start).code;
  if (code == tok::LSQB) return NodeForSequencePattern(start, end);
  if (code == tok::LPAR && FindCode(tok::COMMA, start + 1, end) >= 0) return NodeForSequencePattern(start, end);
  if (code == tok::LBRACE) return NodeForMappingPattern(start, end);
  if (code == tok::LPAR) {
    const Level level(this, start);
    Push(TokNode(start));
    Push(NodeForPattern(start + 1, end - 1));
    // The token just behind the range is tested, not its last one: a group passes only as the last
    // thing inside another bracket.
    if (!Is(end, tok::RPAR)) throw ParseExceptionAt(end - 1);
    Push(TokNode(end - 1));
    return Finish<CPatternNode>(mark);
  }

  if (end != start + 1) {
    if (code == tok::PLUS || code == tok::MINUS || code == tok::NUMBER) return NodeForNumberPattern(start, end);
    if (IsNameCode(code)) {
      return FindCode(tok::LPAR, start + 1, end) >= 0 ? NodeForClassPattern(start, end)
                                                      : NodeForDottedNameValue(start, end);
    }
    if (code == tok::STAR && end == start + 2 && IsNameCode(At(start + 1).code)) {
      Push(TokNode(start));
      Push(TokNode(start + 1));
      return Finish<CPatternNode>(mark);
    }
    throw ParseExceptionAt(start);
  }

  // One token: a capture, the wildcard, a constant. No difference is made between them.
  if (IsNameCode(code) || code == tok::NUMBER || code == tok::STRING) return TokNode(start);
  throw ParseExceptionAt(start);
}

CNode* CMatchCaseStatementParser::NodeForSequencePattern(int64_t start, int64_t end) {
  if (start + 1 >= end) throw ParseExceptionAt(start);
  const Level level(this, start);
  const size_t mark = Mark();
  Push(TokNode(start));
  const int64_t close_i = end - 1;
  for (int64_t i = start + 1; i < close_i;) {
    const int64_t comma_i = FindCode(tok::COMMA, i, close_i);
    const int64_t stop = comma_i >= 0 ? comma_i : close_i;
    Push(NodeForPattern(i, stop));
    if (comma_i >= 0) Push(TokNode(comma_i));
    i = stop + 1;
  }
  if ((Is(start, tok::LSQB) && !Is(close_i, tok::RSQB)) || (Is(start, tok::LPAR) && !Is(close_i, tok::RPAR)))
    throw ParseExceptionAt(close_i);
  Push(TokNode(close_i));
  return Finish<CSequencePatternNode>(mark);
}

// Keys are whole patterns; "**" may stand anywhere and more than once. Commas are no children.
CNode* CMatchCaseStatementParser::NodeForMappingPattern(int64_t start, int64_t end) {
  if (start + 1 >= end) throw ParseExceptionAt(start);
  const Level level(this, start);
  const size_t mark = Mark();
  Push(TokNode(start));
  const int64_t close_i = end - 1;
  for (int64_t i = start + 1; i < close_i;) {
    int64_t comma_i = FindCode(tok::COMMA, i, close_i);
    if (comma_i < 0) comma_i = close_i;
    const int64_t colon_i = FindCode(tok::COLON, i, comma_i);
    if (colon_i >= 0) {
      Push(NodeForPattern(i, colon_i));
      Push(TokNode(colon_i));
      Push(NodeForPattern(colon_i + 1, comma_i));
    } else {
      if (!Is(i, tok::DOUBLESTAR)) throw ParseExceptionAt(i);
      Push(TokNode(i));
      Push(NodeForPattern(i + 1, comma_i));
    }
    i = comma_i + 1;
  }
  if (!Is(close_i, tok::RBRACE)) throw ParseExceptionAt(close_i);
  Push(TokNode(close_i));
  return Finish<CSequencePatternNode>(mark);
}

// The closing parenthesis is checked but is no child.
CNode* CMatchCaseStatementParser::NodeForClassPattern(int64_t start, int64_t end) {
  const int64_t paren_i = FindCode(tok::LPAR, start, end);
  if (paren_i < 0) throw ParseExceptionAt(start);
  const Level level(this, paren_i);
  const size_t mark = Mark();
  Push(NodeForDottedNameValue(start, paren_i));
  Push(TokNode(paren_i));
  const int64_t close_i = end - 1;
  for (int64_t i = paren_i + 1; i < close_i;) {
    const int64_t comma_i = FindCode(tok::COMMA, i, close_i);
    const int64_t stop = comma_i >= 0 ? comma_i : close_i;
    const int64_t eq_i = FindCode(tok::EQUAL, i, stop);
    if (eq_i < 0) {
      Push(NodeForPattern(i, stop));
    } else {
      // The keyword is the one token in front of "=", of whatever type.
      if (eq_i != i + 1) throw ParseExceptionAt(eq_i);
      const size_t argument = Mark();
      Push(TokNode(i));
      Push(TokNode(eq_i));
      Push(NodeForPattern(eq_i + 1, stop));
      Push(Finish<CClassArgumentPatternNode>(argument));
    }
    if (comma_i >= 0) Push(TokNode(comma_i));
    i = stop + 1;
  }
  if (!Is(close_i, tok::RPAR)) throw ParseExceptionAt(close_i);
  return Finish<CClassPatternNode>(mark);
}

// Also what rejects a run that begins with a name and is neither dotted nor a class pattern: `a b`
// fails at the second token.
CNode* CMatchCaseStatementParser::NodeForDottedNameValue(int64_t start, int64_t end) {
  if (end <= start) throw ParseExceptionAt(end - 1);
  const size_t mark = Mark();
  bool expect_dot = false;
  for (int64_t i = start; i < end; ++i) {
    const TokenCode code = At(i).code;
    if (expect_dot ? code != tok::DOT : !IsNameCode(code)) throw ParseExceptionAt(i);
    expect_dot = !expect_dot;
    Push(TokNode(i));
  }
  if (!expect_dot) throw ParseExceptionAt(end - 1);
  return Finish<CExpression>(mark);
}

// One signed number and an optional second part. The reads behind the first number are not held
// against the end of the range, and the second number need not be imaginary.
CNode* CMatchCaseStatementParser::NodeForNumberPattern(int64_t start, int64_t end) {
  const auto is_sign = [&](int64_t at) { return Is(at, tok::PLUS) || Is(at, tok::MINUS); };
  const size_t mark = Mark();
  int64_t i = start;
  if (is_sign(i)) Push(TokNode(i++));
  if (!Is(i, tok::NUMBER)) throw ParseExceptionAt(i);
  Push(TokNode(i));
  int64_t next_i = i + 1;
  if (is_sign(next_i)) {
    Push(TokNode(next_i));
    if (!Is(next_i + 1, tok::NUMBER)) throw ParseExceptionAt(next_i + 1);
    Push(TokNode(next_i + 1));
    next_i += 2;
  }
  if (next_i != end) throw ParseExceptionAt(next_i);
  return Finish<CPatternNode>(mark);
}

}  // namespace quillet
