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
};

class ScopeTracker {
 public:
  // For another source; keeps its memory.
  void Reset() { scopes_.clear(); }

  // The place of the next row's line.
  LinePlace Next(const LineRow& row);

 private:
  struct Scope {
    uint32_t indent;
    bool is_def;
    bool is_async;
    bool is_inline;     // its body is on its own line and ends with that
    bool awaits_first;  // no statement of the body was seen
  };

  std::vector<Scope> scopes_;
};

inline LinePlace ScopeTracker::Next(const LineRow& row) {
  if (row.kind == LineKind::kBlankLine) return {};
  const bool is_comment = row.kind == LineKind::kComment;
  while (!scopes_.empty() && !row.continues_physical_line) {
    const Scope& scope = scopes_.back();
    if (!scope.is_inline && (is_comment || scope.indent < row.indent)) break;
    scopes_.pop_back();
  }

  LinePlace place;
  place.depth = static_cast<uint32_t>(scopes_.size());
  if (!scopes_.empty()) {
    Scope& scope = scopes_.back();
    place.in_async_def = scope.is_async;
    place.in_def = scope.is_def;
    place.in_class = !scope.is_def;
    place.first_in_def = scope.is_def && scope.awaits_first;
    if (!is_comment) scope.awaits_first = false;
  }
  if (row.kind == LineKind::kFunctionDef || row.kind == LineKind::kClassDef) {
    const bool is_def = row.kind == LineKind::kFunctionDef;
    scopes_.push_back({row.indent, is_def, is_def && row.is_async, row.has_inline_body, true});
  }
  return place;
}

}  // namespace quillet
