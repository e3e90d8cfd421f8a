// Statements newer than the grammar tables: `with (...)`, `except*`, type parameters, `type`, and
// the entry for `match` and `case`.
//
// A newer statement is rewritten into one that the tables know by blanking tokens in a copy, never
// by moving one, so every index stays that of the source; what was blanked comes back as nodes. Null
// means an ordinary statement. A bound is a statement of its own to the parser, so a bound can hold
// type parameters whose bounds hold more: that nesting has a limit of its own, and a bound is parsed
// where it stands (a run with a base index) instead of in a copy, since a list may hold many.
#include <algorithm>

#include "foundations/errors.h"
#include "parser/owned_nodes.h"
#include "parser/parser.h"

namespace quillet {

// A rewritable copy of a run's tokens in one of the parser's buffers.
class CPGenParserImpl::TokenCopy {
 public:
  TokenCopy(Scratch& scratch, TokenRun run) : scratch_(scratch), slot_(scratch.used), base_(run.base) {
    if (slot_ == scratch.buffers.size()) scratch.buffers.emplace_back();
    scratch.buffers[slot_].assign(run.toks.begin(), run.toks.end());
    ++scratch.used;
  }
  TokenCopy(const TokenCopy&) = delete;
  TokenCopy& operator=(const TokenCopy&) = delete;
  ~TokenCopy() {
    // One huge statement does not stay in memory.
    if (tokens().capacity() > kKeptTokens) std::vector<Token>().swap(tokens());
    --scratch_.used;
  }

  void Blank(int64_t i) { tokens()[i] = Token{}; }
  void Blank(int64_t first, int64_t last) { std::fill(tokens().begin() + first, tokens().begin() + last + 1, Token{}); }
  TokenRun run() { return {tokens(), base_}; }

 private:
  static constexpr size_t kKeptTokens = 4096;

  std::vector<Token>& tokens() { return scratch_.buffers[slot_]; }

  Scratch& scratch_;
  size_t slot_;
  int32_t base_;
};

CNode* CPGenParserImpl::ParseSpecialCases(TokenSpan toks, bool in_async_def, const PositionView& positions) {
  return SpecialCases({toks}, in_async_def, positions);
}
CNode* CPGenParserImpl::ParseSpecialCaseParenthesizedWith(TokenSpan toks, bool in_async_def,
                                                          const PositionView& positions, int64_t tok_i) {
  return ParenthesizedWith({toks}, in_async_def, positions, tok_i);
}
CNode* CPGenParserImpl::ParseSpecialCaseExceptStar(TokenSpan toks, bool in_async_def, const PositionView& positions,
                                                   int64_t tok_i) {
  return ExceptStar({toks}, in_async_def, positions, tok_i);
}
CNode* CPGenParserImpl::ParseSpecialCaseWithTypeParameter(TokenSpan toks, bool in_async_def,
                                                          const PositionView& positions, int64_t tok_i) {
  return WithTypeParameter({toks}, in_async_def, positions, tok_i);
}
NodeList CPGenParserImpl::NodesForTypeParameters(TokenSpan toks, bool in_async_def, const PositionView* positions,
                                                 int64_t start, int64_t end, bool raise_errors) {
  return TypeParameters({toks}, in_async_def, positions, start, end, raise_errors);
}
CNode* CPGenParserImpl::CreateSingleTypeParameterNode(TokenSpan toks, bool in_async_def, const PositionView* positions,
                                                      int64_t start, int64_t end, bool raise_errors) {
  return SingleTypeParameter({toks}, in_async_def, positions, start, end, raise_errors);
}

CNode* CPGenParserImpl::SpecialCases(TokenRun run, bool in_async_def, const PositionView& positions) {
  const int64_t first_i = FindNextNonSkipIndex(run.toks, -1);
  if (first_i >= run.count()) return nullptr;
  const auto own_positions = [&] {
    return positions.Slice(std::min(static_cast<size_t>(run.base), positions.size()), positions.size());
  };
  switch (run.toks[first_i].code) {
    case word::kWith:
      return ParenthesizedWith(run, in_async_def, positions, first_i);
    case word::kMatch:
    case word::kCase:
      try {
        return run.toks[first_i].code == word::kMatch ? match_case_parser_->ParseMatchStmt(run.toks, own_positions())
                                                      : match_case_parser_->ParseCaseStmt(run.toks, own_positions());
      } catch (ParseError& error) {
        // That parser counts from the front of the run; positions and what a host raised stand as they are.
        if (error.context.IsIndex() && !error.is_of_host()) error.context.value += run.base;
        throw;
      }
    case word::kExcept:
      return ExceptStar(run, in_async_def, positions, first_i);
    case word::kType:
    case word::kDef:
    case word::kClass:
      return WithTypeParameter(run, in_async_def, positions, first_i);
    case word::kAsync: {
      const int64_t next_i = FindNextNonSkipIndex(run.toks, first_i);
      if (next_i >= run.count() || run.toks[next_i].code != word::kDef) return nullptr;
      return WithTypeParameter(run, in_async_def, positions, next_i);
    }
    default:
      return nullptr;
  }
}

// Any bracket right behind `with` is dropped, with a comma at its end: crude on purpose, it accepts
// all that the newer syntax allows and leaves what follows the bracket as it was.
CNode* CPGenParserImpl::ParenthesizedWith(TokenRun run, bool in_async_def, const PositionView& positions,
                                          int64_t tok_i) {
  const int64_t open_i = FindNextNonSkipIndex(run.toks, tok_i);
  if (open_i >= run.count() || run.toks[open_i].code != tok::LPAR) return nullptr;
  const int64_t close_i = NonNestedFindTokenIndex(")", run.toks, open_i + 1, run.count());
  if (close_i <= open_i) return nullptr;
  const int64_t prev_i = FindPrevNonSkipIndex(run.toks, close_i);

  TokenCopy copy(scratch_, run);
  copy.Blank(open_i);
  copy.Blank(close_i);
  if (prev_i < run.count() && run.toks[prev_i].code == tok::COMMA) copy.Blank(prev_i);
  try {
    return ParseRunImpl(copy.run(), in_async_def, &positions);
  } catch (ParseError& error) {
    // What is missing without the bracket need not be missing within it.
    if (error.context.value < run.IndexOf(close_i)) error.needed = tok::ENDMARKER;
    throw;
  }
}

// `except*:` without a type is left to the grammar to reject.
CNode* CPGenParserImpl::ExceptStar(TokenRun run, bool in_async_def, const PositionView& positions, int64_t tok_i) {
  const int64_t star_i = FindNextNonSkipIndex(run.toks, tok_i);
  if (star_i >= run.count() || run.toks[star_i].code != tok::STAR) return nullptr;
  const int64_t next_i = FindNextNonSkipIndex(run.toks, star_i);
  if (next_i >= run.count() || run.toks[next_i].code == tok::COLON) return nullptr;

  TokenCopy copy(scratch_, run);
  copy.Blank(star_i);
  return ParseRunImpl(copy.run(), in_async_def, &positions);
}

CNode* CPGenParserImpl::WithTypeParameter(TokenRun run, bool in_async_def, const PositionView& positions,
                                          int64_t tok_i) {
  if (tok_i < 0 || tok_i >= run.count()) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  const bool is_type_stmt = run.toks[tok_i].code == word::kType;
  const int64_t name_i = FindNextNonSkipIndex(run.toks, tok_i);
  if (name_i >= run.count() || !IsNameCode(run.toks[name_i].code)) return nullptr;
  const int64_t open_i = FindNextNonSkipIndex(run.toks, name_i);
  if (open_i >= run.count()) return nullptr;

  const bool has_params = run.toks[open_i].code == tok::LSQB;
  if (!is_type_stmt && !has_params) return nullptr;
  OwnedNodes params(factory_->pool());
  int64_t close_i = -1;
  if (has_params) {
    close_i = NonNestedFindTokenIndex("]", run.toks, open_i + 1, run.count());
    if (close_i < 0) RaiseParseError(run.IndexOf(open_i));
    params.Add(TypeParameters(run, in_async_def, &positions, open_i, close_i, true));
  }

  TokenCopy copy(scratch_, run);
  if (is_type_stmt) copy.Blank(tok_i);
  if (has_params) copy.Blank(open_i, close_i);
  CNode* stmt = ParseRunImpl(copy.run(), in_async_def, &positions);
  if (!has_params || stmt == nullptr) return stmt;
  auto* wrapper = factory_->NewBare<CWithTypeParameters>();
  params.Add(stmt);
  factory_->SetChildren(wrapper, params.nodes());
  params.Release();
  return wrapper;
}

NodeList CPGenParserImpl::TypeParameters(TokenRun run, bool in_async_def, const PositionView* positions, int64_t start,
                                         int64_t end, bool raise_errors) {
  OwnedNodes nodes(factory_->pool());
  if (start >= end) return nodes.Release();
  for (int64_t i = start + 1; i < end;) {
    const int64_t comma_i = NonNestedFindTokenIndex(",", run.toks, i, end);
    const int64_t param_end = comma_i >= 0 ? comma_i : end;
    CNode* node = SingleTypeParameter(run, in_async_def, positions, i, param_end, raise_errors);
    if (node != nullptr) nodes.Add(node);
    i = param_end + 1;
  }
  return nodes.Release();
}

CNode* CPGenParserImpl::SingleTypeParameter(TokenRun run, bool in_async_def, const PositionView* positions,
                                            int64_t start, int64_t end, bool raise_errors) {
  if (start >= end) return nullptr;
  const auto code_at = [&](int64_t i) {
    if (i < 0 || i >= run.count()) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
    return run.toks[i].code;
  };
  const auto fail = [&](int64_t i) -> CNode* {
    if (raise_errors) RaiseParseError(run.IndexOf(i));
    return nullptr;
  };

  OwnedNodes nodes(factory_->pool());
  int64_t name_i = -1;
  const TokenCode first_code = code_at(start);
  if (IsNameCode(first_code)) {
    name_i = start;
  } else if (first_code == tok::STAR || first_code == tok::DOUBLESTAR) {
    nodes.Add(factory_->CreateOperatorNode(run.toks[start].view(), Context::Index(run.IndexOf(start))));
    // Not held against `end`: a star at the very end of the tokens is an index error.
    const int64_t next_i = FindNextNonSkipIndex(run.toks, start);
    if (IsNameCode(code_at(next_i))) name_i = next_i;
  }
  if (name_i < 0) return fail(start);

  const int64_t colon_i = FindNextNonSkipIndex(run.toks, name_i);
  if (colon_i < end && code_at(colon_i) != tok::COLON) return fail(colon_i);
  CNode* bound = nullptr;
  if (colon_i + 1 < end) bound = TypeParameterBound(run, in_async_def, positions, colon_i, end, raise_errors);
  nodes.Add(factory_->NewNameNode(run.toks[name_i].view(), Context::Index(run.IndexOf(name_i))));
  if (bound != nullptr) {
    nodes.Add(factory_->CreateOperatorNode(run.toks[colon_i].view(), Context::Index(run.IndexOf(colon_i))));
    nodes.Add(bound);
  }
  auto* param = factory_->NewBare<CTypeParameter>();
  factory_->SetChildren(param, nodes.nodes());
  nodes.Release();
  return param;
}

// The bound behind the colon, parsed where it stands; null for one that does not parse where errors
// are not to be raised, and for one that consists of comments only.
CNode* CPGenParserImpl::TypeParameterBound(TokenRun run, bool in_async_def, const PositionView* positions,
                                           int64_t colon_i, int64_t end, bool raise_errors) {
  if (positions == nullptr) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
  struct Nesting {
    int& depth;
    explicit Nesting(int& counter) : depth(counter) { ++depth; }
    ~Nesting() { --depth; }
  } nesting(bound_depth_);
  try {
    if (bound_depth_ > kMaxBoundDepth) RaiseParseError(run.IndexOf(colon_i));
    end = std::min(end, run.count());
    const TokenRun bound{run.toks.subspan(colon_i + 1, end - colon_i - 1), run.IndexOf(colon_i + 1)};
    const size_t position_end = std::min(positions->size(), static_cast<size_t>(run.IndexOf(end)));
    return ParseRun(bound, in_async_def, positions->First(position_end));
  } catch (const ParseError&) {
    if (raise_errors) throw;
    return nullptr;
  }
}

NodeList CPGenParserImpl::GetTypeParameterNodes(TokenSpan toks) {
  const int64_t count = static_cast<int64_t>(toks.size());
  int64_t i = FindNextNonSkipIndex(toks, -1);
  if (i < count && toks[i].code == word::kAsync) i = FindNextNonSkipIndex(toks, i);
  if (i >= count) return {};
  const TokenCode code = toks[i].code;
  if (code != word::kType && code != word::kClass && code != word::kDef) return {};
  const int64_t name_i = FindNextNonSkipIndex(toks, i);
  if (name_i >= count || !IsNameCode(toks[name_i].code)) return {};
  const int64_t open_i = FindNextNonSkipIndex(toks, name_i);
  if (open_i >= count || toks[open_i].code != tok::LSQB) return {};
  const int64_t close_i = NonNestedFindTokenIndex("]", toks, open_i + 1, count);
  if (close_i < 0) RaiseParseError(open_i);
  return NodesForTypeParameters(toks, false, nullptr, open_i, close_i, false);
}

}  // namespace quillet
