// CMatchCaseStatementParser parses the heads of match and case statements by hand.
//
// The words are soft keywords: each entry point may give null, which sends the line to the regular
// parser. A pattern is split from the outside in, by searches outside of brackets; the order of the
// tests decides precedence (patterns.cc). The grammar is approximated: some ill-formed patterns
// pass. Patterns nested deeper than kMaxPatternDepth are a ParseError at the token that opens the
// next level.
#pragma once

#include <span>
#include <vector>

#include "siblings/logicalline/logical_line.h"
#include "tree/factory.h"
#include "tree/nodes.h"

namespace quillet {

class CPGenParserImpl;

class CMatchCaseStatementParser {
 public:
  static constexpr int kMaxPatternDepth = 200;

  explicit CMatchCaseStatementParser(CPGenParserImpl* pgen_parser);

  CNode* ParseMatchStmt(TokenSpan toks, const PositionView& positions);
  CNode* ParseCaseStmt(TokenSpan toks, const PositionView& positions);

  // ---- steps, callable on their own by a host between SetTokens and ClearTokens ----
  void SetTokens(TokenSpan toks, const PositionView& positions);  // drops comments and continuations
  void ClearTokens();
  TokenSpan toks() const { return toks_; }
  std::span<const Position> positions() const { return positions_; }
  int64_t NonNestedFindTokenIndex(Text tok, int64_t start, int64_t end) const;
  CNode* ParseMatchStmtImpl();
  CNode* ParseCaseStmtImpl();
  CNode* NodeForPattern(int64_t start, int64_t end, bool allow_as = true);
  CNode* NodeForSequencePattern(int64_t start, int64_t end);
  CNode* NodeForMappingPattern(int64_t start, int64_t end);
  CNode* NodeForClassPattern(int64_t start, int64_t end);
  CNode* NodeForDottedNameValue(int64_t start, int64_t end);
  CNode* NodeForNumberPattern(int64_t start, int64_t end);
  CNode* TokNode(int64_t tok_i);
  ParseError ParseExceptionAt(int64_t tok_i) const;

 private:
  CPGenParserImpl* pgen_parser_;
  CNodeFactory* factory_;
  std::vector<Token> toks_;
  std::vector<Position> positions_;
  bool has_tokens_ = false;
  int depth_ = 0;
};

}  // namespace quillet
