// The heads of match and case statements: subject, pattern, guard and body found by searches outside
// of brackets, and all but the pattern handed to the token parser.
//
// The soft keyword is judged by FindMatchOrCaseType; a line that is no such statement, or has no
// colon, gives null. Leaves made here carry positions for contexts. Runs given to the token parser
// are slices, so that indices inside a guard or a body count from the slice's start.
#include "parser/match_case_parser.h"

#include <algorithm>

#include "foundations/errors.h"
#include "parser/parser.h"

namespace quillet {

namespace {

constexpr Token kOpenParen{"(", 1, tok::LPAR};
constexpr Token kCloseParen{")", 1, tok::RPAR};

int DepthChange(const Token& token) {
  switch (token.code) {
    case tok::LPAR:
    case tok::LSQB:
    case tok::LBRACE:
      return 1;
    case tok::RPAR:
    case tok::RSQB:
    case tok::RBRACE:
      return -1;
    default:
      return 0;
  }
}

}  // namespace

CMatchCaseStatementParser::CMatchCaseStatementParser(CPGenParserImpl* pgen_parser)
    : pgen_parser_(pgen_parser), factory_(&pgen_parser->factory()) {}

CNode* CMatchCaseStatementParser::ParseMatchStmt(TokenSpan toks, const PositionView& positions) {
  return ParseStmt(toks, positions, &CMatchCaseStatementParser::ParseMatchStmtImpl);
}

CNode* CMatchCaseStatementParser::ParseCaseStmt(TokenSpan toks, const PositionView& positions) {
  return ParseStmt(toks, positions, &CMatchCaseStatementParser::ParseCaseStmtImpl);
}

CNode* CMatchCaseStatementParser::ParseStmt(TokenSpan toks, const PositionView& positions,
                                            CNode* (CMatchCaseStatementParser::*impl)()) {
  const Running running(this);
  struct Clear {
    CMatchCaseStatementParser* parser;
    ~Clear() { parser->ClearTokens(); }
  } clear{this};
  SetKeptTokens(toks, positions);
  return (this->*impl)();
}

void CMatchCaseStatementParser::SetKeptTokens(TokenSpan toks, const PositionView& positions) {
  ClearTokens();
  toks_.reserve(toks.size());
  positions_.reserve(toks.size());
  const size_t count = std::min(toks.size(), positions.size());
  for (size_t i = 0; i < toks.size(); ++i) {
    const Token& token = toks[i];
    if (token.removed()) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
    if (token.length == 0) ThrowError(ErrorKind::kIndexError, "string index out of range");
    if (token.text[0] == '#') continue;
    if (token.text[0] == '\\' && i + 1 < count && positions.LineOf(i) < positions.LineOf(i + 1)) continue;
    if (i >= count) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
    toks_.push_back(token);
    positions_.push_back(positions[i]);
  }
  FindGroupEnds();
}

void CMatchCaseStatementParser::SetTokens(TokenSpan toks, const PositionView& positions) {
  for (const Token& token : toks)
    if (token.removed()) ThrowError(ErrorKind::kTypeError, "Expected str, got NoneType");
  ClearTokens();
  toks_.assign(toks.begin(), toks.end());
  for (size_t i = 0; i < std::min(toks.size(), positions.size()); ++i) positions_.push_back(positions[i]);
  FindGroupEnds();
}

void CMatchCaseStatementParser::ClearTokens() {
  toks_.clear();
  positions_.clear();
  ++change_count_;
}

void CMatchCaseStatementParser::ReclaimPending() {
  for (CNode* node : pending_) factory_->pool().Reclaim(node);
  pending_.clear();
}

void CMatchCaseStatementParser::CheckIdle() const {
  if (is_running_) ThrowError(ErrorKind::kRuntimeError, "a match or case statement is being parsed");
}

// Works from the end: `place_of_depth_[d]` is the first index behind the current one in front of
// which the nesting is `d`.
void CMatchCaseStatementParser::FindGroupEnds() {
  const int32_t count = static_cast<int32_t>(toks_.size());
  group_end_.resize(count);
  int32_t depth = 0;
  int32_t lowest = 0;
  int32_t highest = 0;
  for (const Token& token : toks_) {
    depth += DepthChange(token);
    lowest = std::min(lowest, depth);
    highest = std::max(highest, depth);
  }
  place_of_depth_.assign(highest - lowest + 1, count);
  for (int32_t i = count - 1; i >= 0; --i) {
    place_of_depth_[depth - lowest] = i + 1;
    depth -= DepthChange(toks_[i]);
    group_end_[i] = place_of_depth_[depth - lowest];
  }
}

template <class Matches>
int64_t CMatchCaseStatementParser::FindNonNested(Matches matches, int64_t start, int64_t end) const {
  if (end <= start) return -1;
  if (start < 0) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  const int64_t stop = std::min(end, static_cast<int64_t>(toks_.size()));
  for (int64_t i = start; i < stop;) {
    // The match comes before the bracket counts, so that a bracket can be searched for.
    if (matches(toks_[i])) return i;
    i = DepthChange(toks_[i]) == 0 ? i + 1 : group_end_[i];
  }
  if (stop < end) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  return -1;
}

int64_t CMatchCaseStatementParser::NonNestedFindTokenIndex(Text tok, int64_t start, int64_t end) const {
  return FindNonNested([tok](const Token& token) { return token.view() == tok; }, start, end);
}

int64_t CMatchCaseStatementParser::FindCode(TokenCode code, int64_t start, int64_t end) const {
  return FindNonNested([code](const Token& token) { return token.code == code; }, start, end);
}

int64_t CMatchCaseStatementParser::PlaceOf(int64_t i) const {
  const int64_t count = static_cast<int64_t>(toks_.size());
  const int64_t place = i < 0 ? i + count : i;
  if (place < 0 || place >= count) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  return place;
}

Context CMatchCaseStatementParser::ContextAt(int64_t i) const {
  const size_t place = static_cast<size_t>(PlaceOf(i));
  if (place >= positions_.size()) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  return Context::At(positions_[place]);
}

PositionView CMatchCaseStatementParser::SlicePositions(int64_t begin, int64_t end) const {
  return PositionView(positions_).Slice(begin, end);
}

CNode* CMatchCaseStatementParser::ParseMatchStmtImpl() {
  const int64_t count = static_cast<int64_t>(toks_.size());
  if (FindMatchOrCaseType(toks_, 0, toks_.size()) != LineKind::kMatch) return nullptr;
  const int64_t colon_i = FindCode(tok::COLON, 1, count);
  if (colon_i < 0) return nullptr;

  // The subject is parsed as one expression in parentheses, which is how `a, b` and `*a, b` are
  // accepted. The last token is replaced whether or not it is the colon that was found, and the
  // replaced tokens keep the positions of those they stand for.
  const size_t mark = Mark();
  Push(TokNode(0));
  const PositionView positions = SlicePositions(0, count);
  const auto parse_in_parens = [&] {
    struct Restore {
      Token& token;
      Token written;
      ~Restore() { token = written; }
    };
    const Restore first{toks_.front(), toks_.front()};
    const Restore last{toks_.back(), toks_.back()};
    toks_.front() = kOpenParen;
    toks_.back() = kCloseParen;
    return pgen_parser_->ParseToksToNodeImpl(toks_, true, &positions);
  };
  CNode* subject = parse_in_parens();
  if (subject == nullptr) ThrowError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fChildren'");
  if (subject->ChildCount() == 3 && subject->ChildIs(0, tok::LPAR) && subject->ChildIs(2, tok::RPAR)) {
    CNode* inner = factory_->PopChild(subject, 1);
    FinishedWithNode(subject);
    subject = inner;
  }

  Push(subject);
  Push(TokNode(colon_i));
  return Finish<CMatchStmt>(mark);
}

CNode* CMatchCaseStatementParser::ParseCaseStmtImpl() {
  const int64_t count = static_cast<int64_t>(toks_.size());
  if (FindMatchOrCaseType(toks_, 0, toks_.size()) != LineKind::kCase) return nullptr;
  const int64_t colon_i = FindCode(tok::COLON, 1, count);
  if (colon_i < 0) return nullptr;
  const int64_t if_i = FindCode(word::kIf, 1, colon_i);

  // In this order, so that an error in the pattern wins over one in the guard or the body.
  const auto parse_slice = [&](int64_t begin, int64_t end) {
    const PositionView positions = SlicePositions(begin, end);
    return pgen_parser_->ParseToksToNodeImpl(TokenSpan(toks_).subspan(begin, end - begin), true, &positions);
  };
  const size_t mark = Mark();
  Push(TokNode(0));
  Push(NodeForPattern(1, if_i >= 0 ? if_i : colon_i));
  if (if_i >= 0) Push(parse_slice(if_i, colon_i + 1));
  Push(TokNode(colon_i));
  // A lone backslash behind the colon is no body.
  if (colon_i + 1 < count)
    if (CNode* body = parse_slice(colon_i + 1, count)) Push(body);
  return Finish<CCaseStmt>(mark);
}

CNode* CMatchCaseStatementParser::TokNode(int64_t tok_i) {
  const Token& token = At(tok_i);
  const Context context = ContextAt(tok_i);
  CNodeClassInfo* record = IsNameCode(token.code) && factory_->keywords().Contains(token.view(), token.code)
                               ? factory_->keyword_class_info()
                               : factory_->RecordForState(TypeOfCode(token.code));
  return factory_->NewNode(record, token.view(), token.code, context, nullptr, 0);
}

ParseError CMatchCaseStatementParser::ParseExceptionAt(int64_t tok_i) const {
  const Token& token = At(tok_i);
  return ParseError("Invalid syntax", 0, token.view(), ContextAt(tok_i));
}

}  // namespace quillet
