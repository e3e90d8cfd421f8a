// Where the lines of a row begin anew: by words that no bracket holds, and by their indentation.
#include "lines/row_pieces.h"

#include "lines/token_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// Whether a statement that begins so ends with a colon and has a body.
constexpr bool BeginsHead(TokenCode code) {
  switch (code) {
    case word::kAsync:
    case word::kClass:
    case word::kDef:
    case word::kElif:
    case word::kElse:
    case word::kExcept:
    case word::kFor:
    case word::kIf:
    case word::kWhile:
    case word::kWith:
      return true;
    default:
      return false;
  }
}

LineKind KindOfPiece(TokenSpan tokens, size_t first, size_t end) {
  const size_t lead = tokens[first].code == word::kAsync && first + 1 < end ? first + 1 : first;
  if (tokens[lead].code == word::kDef) return LineKind::kFunctionDef;
  if (tokens[lead].code == word::kClass) return LineKind::kClassDef;
  return FindMatchOrCaseType(tokens, first, end);
}

}  // namespace

void RowPieces::Begin(const SourceText& source) {
  begin_ = source.begin();
  tokens_ = source.tokens;
}

const char* RowPieces::BlanksOfLine(const Token& token) const {
  const char* at = token.text;
  while (at > begin_ && (at[-1] == ' ' || at[-1] == '\t' || at[-1] == '\f')) --at;
  return at == begin_ || IsLineEnd(at[-1]) ? at : nullptr;
}

// The end of the piece that begins at the token `first`: in front of a line with a definition, or of one outside of
// brackets. Where the row leaves brackets open, a line that is indented no deeper ends it too, and one that begins with
// a statement's word, and the first line behind the colon of a head.
size_t RowPieces::PieceEnd(const LineRow& row, size_t first, size_t end, bool is_open) const {
  const bool is_head = BeginsHead(tokens_[first].code);
  size_t depth = 0;
  size_t braces = 0;
  TokenCode last = tok::ENDMARKER;  // that counts
  for (size_t i = first; i + 1 < end; ++i) {
    const TokenCode code = tokens_[i].code;
    if (IsOpeningBracket(code)) ++depth;
    if (IsClosingBracket(code) && depth > 0) --depth;
    braces += code == tok::LBRACE;
    braces -= code == tok::RBRACE && braces > 0;
    if (!IsSkipCode(code)) last = code;
    const Token& next = tokens_[i + 1];
    const char* const blanks = code != tok::BACKSLASH ? BlanksOfLine(next) : nullptr;
    if (blanks == nullptr) continue;
    const bool is_async = next.code == word::kAsync && i + 2 < end && tokens_[i + 2].code == word::kDef;
    if (next.code == word::kDef || next.code == word::kClass || is_async) return i + 1;
    if (depth == 0) return i + 1;
    if (!is_open) continue;
    uint32_t indent;
    IndentEnd(blanks, indent);
    if (OnlyBeginsStatement(next.code)) return i + 1;
    if (indent <= row.indent ? !IsClosingBracket(next.code) : is_head && last == tok::COLON && braces == 0)
      return i + 1;
  }
  return end;
}

std::span<const LineRow> RowPieces::Split(const LineRow& row) {
  const size_t end = size_t{row.first_token} + row.token_count;
  int64_t depth = 0;
  bool has_definition = false;
  for (size_t i = row.first_token; i < end; ++i) {
    const TokenCode code = tokens_[i].code;
    if (IsOpeningBracket(code)) ++depth;
    if (IsClosingBracket(code) && depth > 0) --depth;
    if ((code == word::kDef || code == word::kClass) && i != row.first_token) has_definition = true;
  }
  const bool is_open = depth > 0;
  if (!is_open && !has_definition) return {};
  pieces_.clear();
  LineRow piece = row;
  for (size_t first = row.first_token; first < end;) {
    if (first != row.first_token) {
      piece.continues_physical_line = piece.has_inline_body = false;
      IndentEnd(BlanksOfLine(tokens_[first]), piece.indent);
      piece.first_token = static_cast<uint32_t>(first);
    }
    const size_t piece_end = PieceEnd(piece, first, end, is_open);
    piece.token_count = static_cast<uint32_t>(piece_end - first);
    if (first != row.first_token) piece.kind = KindOfPiece(tokens_, first, piece_end);
    pieces_.push_back(piece);
    first = piece_end;
  }
  return pieces_;
}

}  // namespace quillet
