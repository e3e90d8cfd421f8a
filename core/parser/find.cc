// Finding tokens by index: the next or the previous one that counts, and one outside of brackets.
//
// "Not found" is the token count for the first two, so that callers test with one range check, and
// -1 for the last. A token counts unless it was removed, is empty, or is a comment or a backslash;
// only its first character is looked at.
#include <algorithm>

#include "foundations/errors.h"
#include "parser/parser.h"

namespace quillet {

namespace {

bool IsSignificant(const Token& token) { return token.length != 0 && token.text[0] != '#' && token.text[0] != '\\'; }

}  // namespace

int64_t CPGenParserImpl::FindNextNonSkipIndex(TokenSpan toks, int64_t tok_i) {
  const int64_t count = static_cast<int64_t>(toks.size());
  for (int64_t i = tok_i < 0 ? std::max<int64_t>(tok_i + 1, 0) : std::min(tok_i, count) + 1; i < count; ++i)
    if (IsSignificant(toks[i])) return i;
  return count;
}

int64_t CPGenParserImpl::FindPrevNonSkipIndex(TokenSpan toks, int64_t tok_i) {
  const int64_t count = static_cast<int64_t>(toks.size());
  for (int64_t i = std::clamp<int64_t>(tok_i, 0, count) - 1; i >= 0; --i)
    if (IsSignificant(toks[i])) return i;
  return count;
}

int64_t CPGenParserImpl::NonNestedFindTokenIndex(Text tok, TokenSpan toks, int64_t start, int64_t end) {
  if (start >= end) return -1;
  if (start < 0 || end > static_cast<int64_t>(toks.size()))
    ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  int64_t depth = 0;
  for (int64_t i = start; i < end; ++i) {
    const Token& token = toks[i];
    // The match comes before the depth is touched, so that a closing bracket can be searched for.
    if (depth == 0 && token.length == tok.size() && !token.removed() && token.view() == tok) return i;
    if (token.removed()) ThrowError(ErrorKind::kTypeError, "object of type 'NoneType' has no len()");
    if (token.length != 1) continue;
    switch (token.text[0]) {
      case '(':
      case '[':
      case '{':
        ++depth;
        break;
      case ')':
      case ']':
      case '}':
        --depth;
        break;
      default:
        break;
    }
  }
  return -1;
}

const Token* NextNonRemovedTokenInTuple(TokenSpan toks, int64_t i) {
  const int64_t count = static_cast<int64_t>(toks.size());
  for (; i < count; ++i) {
    // An index below 0 counts from the end, as it does for the host.
    if (i < -count) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
    const Token& token = toks[i < 0 ? i + count : i];
    if (token.removed()) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
    if (token.length == 0) ThrowError(ErrorKind::kIndexError, "string index out of range");
    if (token.text[0] != '\\' && token.text[0] != '#') return &token;
  }
  return nullptr;
}

}  // namespace quillet
