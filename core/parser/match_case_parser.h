// CMatchCaseStatementParser parses the heads of match and case statements by hand.
//
// The words are soft keywords: each entry point may give null, which sends the line to the regular
// parser. A pattern is split from the outside in, by searches outside of brackets; the order of the
// tests decides precedence (patterns.cc). The grammar is approximated: some ill-formed patterns
// pass. Patterns in more than kMaxPatternDepth brackets are a ParseError at the bracket that opens
// the next level.
//
// Children wait on one shared list until their node is made; what is left on it when an operation
// ends, in success or not, belongs to no tree and goes back to the pool. One operation runs at a time:
// the tokens are the object's, and a host's code, which may run inside of a parse, could replace them.
#pragma once

#include <span>
#include <vector>

#include "lines/logical_line.h"
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

  // ---- steps, callable on their own by a host between SetTokens and ClearTokens, inside of Run ----
  // Copies the tokens as they are; there may be fewer positions. TypeError for a removed token.
  void SetTokens(TokenSpan toks, const PositionView& positions);
  // Copies the tokens without comments and continuations. TypeError for a removed token, IndexError
  // for an empty one and for one without a position.
  void SetKeptTokens(TokenSpan toks, const PositionView& positions);
  void ClearTokens();
  // Changes with the tokens: whoever set them sees by it whether they are still in place.
  uint64_t change_count() const { return change_count_; }
  // Runs steps; RuntimeError from inside of another operation. A token's index below 0 counts from the
  // end, as it does for the host.
  template <class Steps>
  auto Run(Steps&& steps) {
    const Running running(this);
    return steps();
  }
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
  // One more level of brackets, for as long as it lives; throws at the limit.
  class Level;
  // An operation under way; gives back what it leaves pending.
  class Running {
   public:
    explicit Running(CMatchCaseStatementParser* parser) : parser_(parser) {
      parser->CheckIdle();
      parser->is_running_ = true;
    }
    Running(const Running&) = delete;
    Running& operator=(const Running&) = delete;
    ~Running() {
      parser_->ReclaimPending();
      parser_->is_running_ = false;
    }

   private:
    CMatchCaseStatementParser* parser_;
  };

  void CheckIdle() const;
  void ReclaimPending();
  CNode* ParseStmt(TokenSpan toks, const PositionView& positions, CNode* (CMatchCaseStatementParser::*impl)());
  // Where an index of the host's or of the steps' points to; IndexError for nowhere.
  int64_t PlaceOf(int64_t i) const;
  const Token& At(int64_t i) const { return toks_[PlaceOf(i)]; }
  Context ContextAt(int64_t i) const;
  bool Is(int64_t i, TokenCode code) const { return At(i).code == code; }
  int64_t FindCode(TokenCode code, int64_t start, int64_t end) const;
  template <class Matches>
  int64_t FindNonNested(Matches matches, int64_t start, int64_t end) const;
  void FindGroupEnds();
  PositionView SlicePositions(int64_t begin, int64_t end) const;

  void Push(CNode* node) { pending_.push_back(node); }
  size_t Mark() const { return pending_.size(); }
  // A node whose children are those pending since the mark.
  template <class T>
  CNode* Finish(size_t mark) {
    CNode* node = factory_->NewBare<T>();
    factory_->SetChildren(node, std::span<CNode* const>(pending_).subspan(mark));
    pending_.resize(mark);
    return node;
  }

  CPGenParserImpl* pgen_parser_;
  CNodeFactory* factory_;
  std::vector<Token> toks_;
  std::vector<Position> positions_;
  // For a bracket, the next index at which the nesting is again what it is in front of it; the token
  // count where there is none. A search outside of brackets goes on there.
  std::vector<int32_t> group_end_;
  std::vector<int32_t> place_of_depth_;
  std::vector<CNode*> pending_;
  uint64_t change_count_ = 0;
  int depth_ = 0;
  bool is_running_ = false;
};

}  // namespace quillet
