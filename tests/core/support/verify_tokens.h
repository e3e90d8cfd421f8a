// Checks that hold for the tokens, line starts and rows of any bytes whatever.
//
// Every byte lies in exactly one token or in a gap; gaps hold blanks, line ends, a BOM at the start
// and separators; line starts are those of the bytes; a token's code is that of its text alone; the
// rows take all tokens in order. The answer is the first thing that is wrong, or an empty text.
#pragma once

#include <string>
#include <vector>

#include "lines/cutter.h"
#include "lines/source_text.h"
#include "tokens/token.h"

namespace quillet {

namespace verify {

inline std::string At(const char* what, size_t place) { return std::string(what) + " at " + std::to_string(place); }

// `separators`: whether ";" may stand in a gap.
inline bool IsGap(const SourceText& source, const char* from, const char* to, bool separators) {
  if (from == source.begin() && Text(from, static_cast<size_t>(to - from)).starts_with("\xEF\xBB\xBF")) from += 3;
  const Text allowed = separators ? Text(" \t\f\r\n;") : Text(" \t\f\r\n");
  for (; from < to; ++from) {
    if (allowed.find(*from) == Text::npos) return false;
  }
  return true;
}

inline std::string CheckLineStarts(const SourceText& source) {
  const Text text = source.text();
  std::vector<uint32_t> expected{text.starts_with("\xEF\xBB\xBF") ? 3u : 0u};
  for (size_t i = expected[0]; i < text.size(); ++i) {
    if (text[i] == '\n' || (text[i] == '\r' && text.substr(i + 1, 1) != "\n")) {
      expected.push_back(static_cast<uint32_t>(i + 1));
    }
  }
  return expected == source.line_starts ? "" : "line starts are not those of the bytes";
}

inline std::string CheckTokens(const SourceText& source, bool separators) {
  const char* end = source.begin();
  for (size_t i = 0; i < source.tokens.size(); ++i) {
    const Token& token = source.tokens[i];
    if (token.text < end || token.length == 0) return At("empty or overlapping token", i);
    if (token.end() > source.end()) return At("token past the end", i);
    if (!IsGap(source, end, token.text, separators)) return At("bytes in no token in front of token", i);
    end = token.end();
    if (CodeOfText(token.view()) != token.code) return At("code is not that of the text", i);
  }
  return IsGap(source, end, source.end(), separators) ? "" : "bytes in no token at the end";
}

inline std::string CheckRows(const SourceText& source, const std::vector<LineRow>& rows) {
  uint32_t next = 0;
  uint32_t line = 0;
  for (size_t i = 0; i < rows.size(); ++i) {
    const LineRow& row = rows[i];
    if (row.first_token != next) return At("tokens in no row in front of row", i);
    next += row.token_count;
    if (next > source.tokens.size()) return At("more tokens than there are in row", i);
    if ((row.token_count == 0) != (row.kind == LineKind::kBlankLine)) return At("tokens and kind disagree in row", i);
    if (row.first_line < line || row.last_line < row.first_line) return At("lines out of order in row", i);
    line = row.last_line;
    if (row.continues_physical_line && i == 0) return At("nothing to continue for row", i);
    if (row.has_inline_body && (i + 1 == rows.size() || !rows[i + 1].continues_physical_line)) {
      return At("no body behind row", i);
    }
    if (row.token_count == 0) continue;
    const Token& first = source.tokens[row.first_token];
    const Token& last = source.tokens[next - 1];
    if (source.PositionOf(first.text).line != static_cast<int32_t>(row.first_line)) return At("first line of row", i);
    if (source.PositionOf(last.end() - 1).line != static_cast<int32_t>(row.last_line)) return At("last line of row", i);
  }
  return next == source.tokens.size() ? "" : "tokens in no row at the end";
}

}  // namespace verify

// Checks the tokens of `source` after TokenizeOnly.
inline std::string VerifyTokens(const SourceText& source) {
  const std::string wrong = verify::CheckLineStarts(source);
  return wrong.empty() ? verify::CheckTokens(source, false) : wrong;
}

// Checks tokens and rows of `source` after CutLines.
inline std::string VerifyLines(const SourceText& source, const std::vector<LineRow>& rows) {
  std::string wrong = verify::CheckLineStarts(source);
  if (wrong.empty()) wrong = verify::CheckTokens(source, true);
  return wrong.empty() ? verify::CheckRows(source, rows) : wrong;
}

}  // namespace quillet
