// The stack of open definitions.
#include "lines/scopes.h"

namespace quillet {

LinePlace ScopeTracker::Next(const LineRow& row) {
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
