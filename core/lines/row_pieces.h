// RowPieces: the statements of a row whose lines belong to several.
//
// A bracket that was left open has the cutter put the lines behind it into its statement's row, up to one that begins
// like a statement. Most lines say more by how they are indented, so who reads code while it is being written reads
// such a row in pieces.
#pragma once

#include <span>
#include <vector>

#include "lines/cutter.h"
#include "lines/source_text.h"

namespace quillet {

class RowPieces {
 public:
  // For the rows of a source that was cut.
  void Begin(const SourceText& source);

  // The pieces of a row, in order and with all its tokens; none where it is one statement, as nearly always. They stand
  // until the next call. Their lines are those of the row.
  std::span<const LineRow> Of(const LineRow& row) {
    if (row.first_line == row.last_line) [[likely]]
      return {};
    return Split(row);
  }

 private:
  std::span<const LineRow> Split(const LineRow& row);
  size_t PieceEnd(const LineRow& row, size_t first, size_t end, bool is_open) const;
  // The blanks in front of the first token of a line, or null behind another token.
  const char* BlanksOfLine(const Token& token) const;

  const char* begin_ = nullptr;
  TokenSpan tokens_;
  std::vector<LineRow> pieces_;
};

}  // namespace quillet
