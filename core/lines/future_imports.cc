// Reads the `from __future__` statements at the head of a source.
#include "lines/future_imports.h"

namespace quillet {

namespace {

bool HasToken(TokenSpan toks, Text text) {
  for (const Token& token : toks) {
    if (token.view() == text) return true;
  }
  return false;
}

}  // namespace

bool ImportsPrintFunction(const SourceText& source, std::span<const LineRow> rows) {
  for (const LineRow& row : rows) {
    const TokenSpan toks = TokenSpan(source.tokens).subspan(row.first_token, row.token_count);
    switch (row.kind) {
      case LineKind::kBlankLine:
      case LineKind::kComment:
      case LineKind::kStringExpression:
        break;
      case LineKind::kFromImport:
        if (toks.size() < 2 || toks[1].view() != "__future__") return false;
        if (HasToken(toks, "print_function")) return true;
        break;
      default:
        return false;
    }
  }
  return false;
}

}  // namespace quillet
