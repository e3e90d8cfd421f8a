// Steps over a statement's tokens: past what the parser never sees, past brackets, to the colon that
// ends a head.
//
// Every kind of bracket counts alike, and a closing one that closes nothing is an ordinary token:
// the cutter and the tests on soft keywords have to agree on broken code, too.
#pragma once

#include <cstddef>

#include "tokens/token.h"

namespace quillet {

inline constexpr bool IsOpeningBracket(TokenCode code) {
  return code == tok::LPAR || code == tok::LSQB || code == tok::LBRACE;
}
inline constexpr bool IsClosingBracket(TokenCode code) {
  return code == tok::RPAR || code == tok::RSQB || code == tok::RBRACE;
}

// The first token from `i` on that is neither removed nor a comment nor a backslash, or `end`.
inline size_t NextSignificant(TokenSpan toks, size_t i, size_t end) {
  while (i < end && (toks[i].removed() || IsSkipCode(toks[i].code))) ++i;
  return i;
}

// Behind the bracket that opens at `i` and what it holds; `end` where it is not closed.
inline size_t BehindBracket(TokenSpan toks, size_t i, size_t end) {
  size_t depth = 0;
  for (; i < end; ++i) {
    if (IsOpeningBracket(toks[i].code)) ++depth;
    if (IsClosingBracket(toks[i].code) && --depth == 0) return i + 1;
  }
  return end;
}

// Calls `visit(index)` for the tokens from `i` on outside brackets that no `lambda` there owns: not
// for a lambda's parameters and its colon. `visit` returns true to go on. Returns where it stopped.
template <class Visit>
inline size_t VisitOwnTokens(TokenSpan toks, size_t i, size_t end, Visit visit) {
  size_t lambdas = 0;  // whose colon is still to come
  while (i < end) {
    const TokenCode code = toks[i].code;
    if (lambdas == 0 && !visit(i)) return i;
    if (code == word::kLambda) {
      ++lambdas;
    } else if (code == tok::COLON && lambdas > 0) {
      --lambdas;
    }
    i = IsOpeningBracket(code) ? BehindBracket(toks, i, end) : i + 1;
  }
  return end;
}

// The first colon from `i` on that belongs to the statement itself, or `end`.
inline size_t HeadColon(TokenSpan toks, size_t i, size_t end) {
  return VisitOwnTokens(toks, i, end, [toks](size_t at) { return toks[at].code != tok::COLON; });
}

}  // namespace quillet
