// Bisection over what stands in the order of the source; scopes find what opens them by where they begin.
#include "program/source_file.h"

#include <algorithm>

namespace quillet {

namespace {

bool IsComprehension(ExprKind kind) {
  return kind == ExprKind::kListComprehension || kind == ExprKind::kSetComprehension ||
         kind == ExprKind::kDictComprehension || kind == ExprKind::kGenerator;
}

template <class T>
size_t MemoryOf(const std::vector<T>& items) {
  return items.capacity() * sizeof(T);
}

}  // namespace

const OccurrencesOfSymbols& SourceFile::occurrences() const {
  if (occurrences_ == nullptr) occurrences_ = std::make_unique<OccurrencesOfSymbols>(bindings);
  return *occurrences_;
}

uint32_t SourceFile::OccurrenceBeginningAt(uint32_t offset) const {
  const auto found = std::ranges::lower_bound(bindings.occurrences, offset, {}, &Occurrence::begin);
  if (found == bindings.occurrences.end() || found->begin != offset) return kNoIndex;
  return static_cast<uint32_t>(found - bindings.occurrences.begin());
}

uint32_t SourceFile::OccurrenceAt(uint32_t offset) const {
  const auto behind = std::ranges::upper_bound(bindings.occurrences, offset, {}, &Occurrence::begin);
  if (behind == bindings.occurrences.begin()) return kNoIndex;
  const Occurrence& occurrence = *(behind - 1);
  if (offset > bindings.EndOf(occurrence)) return kNoIndex;
  return OccurrenceBeginningAt(occurrence.begin);
}

// ---- scopes ----

// A definition and its scopes begin at the same word, a lambda at its own, and a comprehension at its bracket: that of
// a call, where nothing else is in it.
void SourceFile::MapScopes() const {
  has_maps_ = true;
  stmt_of_scope_.assign(bindings.scopes.size(), kModuleStmt);
  expr_of_scope_.assign(bindings.scopes.size(), kNoExpr);
  scopes_by_begin_.clear();
  for (uint32_t scope = 1; scope < bindings.scopes.size(); ++scope) {
    switch (bindings.scopes[scope].kind) {
      case NameScopeKind::kFunction:
      case NameScopeKind::kClass:
      case NameScopeKind::kLambda:
      case NameScopeKind::kComprehension:
        scopes_by_begin_.push_back(scope);
        break;
      default:
        break;
    }
  }
  const auto begin_of = [this](uint32_t scope) { return bindings.scopes[scope].begin; };
  std::ranges::stable_sort(scopes_by_begin_, {}, begin_of);
  for (StmtId stmt = 1; stmt < syntax.stmts.size(); ++stmt) {
    const Stmt& definition = syntax.stmt(stmt);
    if (definition.kind != StmtKind::kDef && definition.kind != StmtKind::kClass) continue;
    const uint32_t scope = ScopeBeginningAt(
        definition.begin, definition.kind == StmtKind::kDef ? NameScopeKind::kFunction : NameScopeKind::kClass);
    if (scope != kNoIndex) stmt_of_scope_[scope] = stmt;
  }
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
    const ExprKind kind = syntax[expr].kind;
    if (kind != ExprKind::kLambda && !IsComprehension(kind)) continue;
    const uint32_t scope = FindScopeOfExpr(expr);
    if (scope != kNoIndex) expr_of_scope_[scope] = expr;
  }
}

uint32_t SourceFile::ScopeBeginningAt(uint32_t offset, NameScopeKind kind) const {
  const auto begin_of = [this](uint32_t scope) { return bindings.scopes[scope].begin; };
  for (auto at = std::ranges::lower_bound(scopes_by_begin_, offset, {}, begin_of);
       at != scopes_by_begin_.end() && begin_of(*at) == offset; ++at) {
    if (bindings.scopes[*at].kind == kind) return *at;
  }
  return kNoIndex;
}

uint32_t SourceFile::FindScopeOfExpr(ExprId number) const {
  const Expr& expr = syntax[number];
  if (expr.kind == ExprKind::kLambda) return ScopeBeginningAt(expr.begin, NameScopeKind::kLambda);
  const uint32_t scope = ScopeBeginningAt(expr.begin, NameScopeKind::kComprehension);
  if (expr.kind != ExprKind::kGenerator) return scope;
  if (scope != kNoIndex && bindings.scopes[scope].is_generator) return scope;
  const auto begin_of = [this](uint32_t at) { return bindings.scopes[at].begin; };
  for (auto at = std::ranges::upper_bound(scopes_by_begin_, expr.begin, {}, begin_of);
       at != scopes_by_begin_.begin();) {
    const NameScope& around = bindings.scopes[*--at];
    if (around.is_generator) return around.end >= expr.end ? *at : kNoIndex;
  }
  return kNoIndex;
}

uint32_t SourceFile::ScopeOfStmt(StmtId stmt) const {
  if (stmt == kModuleStmt) return 0;
  if (!has_maps_) MapScopes();
  switch (syntax.stmt(stmt).kind) {
    case StmtKind::kDef:
      return ScopeBeginningAt(syntax.stmt(stmt).begin, NameScopeKind::kFunction);
    case StmtKind::kClass:
      return ScopeBeginningAt(syntax.stmt(stmt).begin, NameScopeKind::kClass);
    default:
      return kNoIndex;
  }
}

uint32_t SourceFile::ScopeOfExpr(ExprId expr) const {
  if (!has_maps_) MapScopes();
  const ExprKind kind = syntax[expr].kind;
  return kind == ExprKind::kLambda || IsComprehension(kind) ? FindScopeOfExpr(expr) : kNoIndex;
}

StmtId SourceFile::StmtOfScope(uint32_t scope) const {
  if (!has_maps_) MapScopes();
  return stmt_of_scope_[scope];
}

ExprId SourceFile::ExprOfScope(uint32_t scope) const {
  if (!has_maps_) MapScopes();
  return expr_of_scope_[scope];
}

// ---- the scope of a place ----

// The scope of an expression around a place within the statement, the innermost first.
uint32_t SourceFile::ExprScopeAt(uint32_t offset) const {
  for (ExprId expr = syntax.ExpressionAt(offset), inner = kNoExpr; expr != kNoExpr;
       inner = expr, expr = syntax[expr].parent) {
    const ExprKind kind = syntax[expr].kind;
    const auto children = syntax.ChildrenOf(expr);
    bool is_inside = false;
    if (kind == ExprKind::kLambda) {
      is_inside = !children.empty() && offset >= syntax[children.back()].begin;
    } else if (IsComprehension(kind) && offset > syntax[expr].begin && offset < syntax[expr].end) {
      // The first iterable alone is read in the scope around.
      is_inside = true;
      for (const ExprId child : children) {
        if (syntax[child].kind != ExprKind::kComprehensionFor) continue;
        const Expr& iterable = syntax[syntax.ChildOf(child, 1)];
        is_inside = inner != child || offset < iterable.begin || offset > iterable.end;
        break;
      }
    }
    if (!is_inside) continue;
    if (const uint32_t scope = ScopeOfExpr(expr); scope != kNoIndex) return scope;
  }
  return kNoIndex;
}

uint32_t SourceFile::ColumnOf(uint32_t offset) const { return static_cast<uint32_t>(bindings.PositionOf(offset).col); }

uint32_t SourceFile::ScopeAt(uint32_t offset) const {
  offset = std::min(offset, static_cast<uint32_t>(source->size()));
  if (const uint32_t scope = ExprScopeAt(offset); scope != kNoIndex) return scope;
  // Between statements the indentation says to whose block a place belongs, as it will once something is written there.
  const Text bytes = text();
  const uint32_t line = offset - ColumnOf(offset);
  uint32_t indent = line;
  while (indent < bytes.size() && (bytes[indent] == ' ' || bytes[indent] == '\t')) ++indent;
  const bool is_blank =
      indent >= bytes.size() || bytes[indent] == '\n' || bytes[indent] == '\r' || bytes[indent] == '#';
  const uint32_t column = is_blank ? offset - line : indent - line;
  // The last statement that begins in front of it, and then those around.
  const auto behind = std::ranges::upper_bound(syntax.stmts.begin() + 1, syntax.stmts.end(), offset, {}, &Stmt::begin);
  auto stmt = static_cast<StmtId>(behind - syntax.stmts.begin() - 1);
  const StmtId holder = syntax.StatementAt(offset);
  if (holder != kModuleStmt && syntax.stmt(holder).begin > offset) stmt = syntax.stmt(holder).parent;  // a decorator
  for (; stmt != kModuleStmt; stmt = syntax.stmt(stmt).parent) {
    const Stmt& around = syntax.stmt(stmt);
    if (around.kind != StmtKind::kDef && around.kind != StmtKind::kClass) continue;
    if (offset <= around.end) continue;
    const bool is_inside = offset <= around.block_end || column > ColumnOf(around.begin);
    if (!is_inside) continue;
    if (const uint32_t scope = ScopeOfStmt(stmt); scope != kNoIndex) return scope;
  }
  return 0;
}

uint32_t SourceFile::ScopeAround(ExprId expr) const {
  if (scopes_around_.empty()) scopes_around_.assign(syntax.exprs.size(), kNoIndex);
  uint32_t& scope = scopes_around_[expr];
  if (scope == kNoIndex) scope = ScopeAt(syntax[expr].begin);
  return scope;
}

// ---- places ----

Position SourceFile::PlaceOf(uint32_t offset) const {
  const Position place = bindings.PositionOf(std::min(offset, static_cast<uint32_t>(source->size())));
  return {place.line + 1, place.col + 1};
}

uint32_t SourceFile::OffsetOf(int line, int column) const {
  const std::vector<uint32_t>& starts = bindings.line_starts;
  const auto size = static_cast<uint32_t>(source->size());
  if (line < 1 || starts.empty()) return 0;
  if (static_cast<size_t>(line) > starts.size()) return size;
  const uint32_t begin = starts[static_cast<size_t>(line) - 1];
  uint32_t end = static_cast<size_t>(line) < starts.size() ? starts[static_cast<size_t>(line)] : size;
  while (end > begin && (source->begin()[end - 1] == '\n' || source->begin()[end - 1] == '\r')) --end;
  return std::min(begin + static_cast<uint32_t>(std::max(column, 1)) - 1, end);
}

size_t SourceFile::ByteSize() const {
  // What is made when it is asked for counts from the beginning.
  const size_t maps = (bindings.scopes.size() * 3 + syntax.exprs.size()) * sizeof(uint32_t);
  const size_t occurrences = (bindings.occurrences.size() + bindings.symbols.size() + 1) * sizeof(uint32_t);
  return sizeof(SourceFile) + path.capacity() + source->size() + MemoryOf(source->line_starts) + bindings.ByteSize() +
         syntax.ByteSize() + maps + occurrences;
}

}  // namespace quillet
