// Bytes to logical lines: one pass that tokenises a source and cuts it into statements.
//
// Input: a SourceText. Output: its tokens and line starts, and one row a logical line, in order.
// Brackets and backslashes join physical lines; ";" cuts statements apart and is in no line, unless it
// ends nothing (`x;;y`): then it is a line, for the parser to reject. The body on the line of a `def`
// or `class` is cut off as a line of its own, any other one-line body stays with its head.
// Comments are tokens of the line they end. A bracket left open is closed by the next line that
// begins, at the statement's own indentation or further out, with a keyword that can only start a
// statement. It never fails: what is no token is an error token.
#pragma once

#include <vector>

#include "foundations/text.h"
#include "lines/logical_line.h"
#include "lines/source_text.h"

namespace quillet {

struct LineRow {
  uint32_t first_token;
  uint32_t token_count;
  uint32_t first_line;  // from 0, of the first token (or of the blank line)
  uint32_t last_line;   // from 0, of the end of the last token, inclusive
  uint32_t indent;      // width of the indentation of the statement's first physical line, tabs to 8
  LineKind kind;
  // The statement shares its physical line with a head or with an earlier statement.
  bool continues_physical_line : 1;
  // The body of a `def` or `class` on the same physical line follows as the next row(s).
  bool has_inline_body : 1;
  bool is_async : 1;     // begins with `async def`, `async for` or `async with`
  bool no_embedded : 1;  // see LogicalLine::no_embedded
  uint8_t unusual;       // what UnusualTokens says; 0 where the source was not cut completely
};
static_assert(sizeof(LineRow) == 24);

// Fills source.tokens and source.line_starts and appends the rows. `version` settles how f-strings
// end (from 3.12 on they nest). OverflowError where tokens and rows would take more than `most_memory`.
void CutLines(SourceText& source, Version version, std::vector<LineRow>& rows, size_t most_memory = SIZE_MAX);
// The same where template strings (3.14) end as they do, and not at their first own quote; and rows say what is
// unusual in them.
void CutLinesCompletely(SourceText& source, Version version, std::vector<LineRow>& rows, size_t most_memory = SIZE_MAX);

// Only the tokens, for measuring and for checks; NEWLINE is not among them.
void TokenizeOnly(SourceText& source, Version version);

// Points `line` at a row: tokens, kind, first line. Records are left as they are. The source is kept by others.
inline void SetFromRow(LogicalLine& line, SourceText& source, const LineRow& row) {
  line.source = &source;
  line.toks = TokenSpan(source.tokens).subspan(row.first_token, row.token_count);
  line.kind = row.kind;
  line.parsed = false;
  line.no_embedded = row.no_embedded;
  line.first_line = static_cast<int32_t>(row.first_line);
  line.token_count = static_cast<int32_t>(row.token_count);
  if (line.has_stored_positions()) line.UseSourcePositions();
}
// The same for a line that holds the source.
inline void SetFromRow(LogicalLine& line, const Ref<SourceText>& source, const LineRow& row) {
  if (line.source != source.get()) line.HoldSource(source);
  SetFromRow(line, *source, row);
}

}  // namespace quillet
