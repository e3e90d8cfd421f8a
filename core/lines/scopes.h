// Where a logical line stands: whether directly in the body of an `async def`, and whether it is the
// first line of a function's body.
//
// Rows are fed in order. The open definitions form a stack, ordered by indentation; a statement that
// is indented no deeper than a definition's own line ends it. Blank lines change nothing. A comment
// never ends a body by its indentation, since comments stand anywhere; and it does not end the state
// of being first either: every comment in front of a body's first statement is "first", and so is
// that statement, because a signature comment stands on a line of its own in front of it.
// Only definitions count: blocks of `if`, `for`, `with` and `try` leave a line where it is.
#pragma once

#include <cstdint>
#include <vector>

#include "lines/cutter.h"

namespace quillet {

struct LinePlace {
  bool in_async_def = false;
  bool first_in_def = false;
  bool in_class = false;  // directly
  bool in_def = false;    // directly, of either kind
  uint32_t depth = 0;     // of the open definitions around the line; 0 for a blank line

  bool operator==(const LinePlace&) const = default;

  // The place of what comes first in a definition that stands here.
  LinePlace Within(const LineRow& definition) const {
    const bool is_def = definition.kind == LineKind::kFunctionDef;
    return {is_def && definition.is_async, is_def, !is_def, is_def, depth + 1};
  }
};

class ScopeTracker {
 public:
  // Fills in the place of the next row's line.
  void Next(const LineRow& row, LinePlace& place);

 private:
  struct Scope {
    uint32_t indent;
    bool is_inline;   // its body is on its own line and ends with that
    LinePlace place;  // of the next line in it
  };

  std::vector<Scope> scopes_;
};

inline void ScopeTracker::Next(const LineRow& row, LinePlace& place) {
  place = {};
  if (row.kind == LineKind::kBlankLine) return;
  const bool is_comment = row.kind == LineKind::kComment;
  while (!scopes_.empty() && !row.continues_physical_line) {
    const Scope& scope = scopes_.back();
    if (!scope.is_inline && (is_comment || scope.indent < row.indent)) break;
    scopes_.pop_back();
  }
  if (!scopes_.empty()) {
    place = scopes_.back().place;
    if (!is_comment) scopes_.back().place.first_in_def = false;
  }
  if (row.kind == LineKind::kFunctionDef || row.kind == LineKind::kClassDef)
    scopes_.push_back({row.indent, row.has_inline_body, place.Within(row)});
}

}  // namespace quillet
