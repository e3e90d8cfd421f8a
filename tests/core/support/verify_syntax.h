// What holds for the statements and expressions of any bytes: they form trees, stand in order in their source,
// and are found where they stand.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "lines/cutter.h"
#include "syntax/reader.h"

namespace quillet {

namespace verify_syntax {

inline std::string At(const char* what, size_t index) { return std::string(what) + " " + std::to_string(index); }

inline bool IsSame(const FileSyntax& a, const FileSyntax& b) {
  if (a.exprs.size() != b.exprs.size() || a.stmts.size() != b.stmts.size() || a.lists != b.lists || a.named != b.named)
    return false;
  for (size_t i = 0; i < a.exprs.size(); ++i) {
    const Expr &x = a.exprs[i], &y = b.exprs[i];
    if (x.kind != y.kind || x.op != y.op || x.flags != y.flags || x.begin != y.begin || x.end != y.end ||
        x.name_begin != y.name_begin || x.parent != y.parent || x.children_begin != y.children_begin)
      return false;
  }
  for (size_t i = 0; i < a.stmts.size(); ++i) {
    const Stmt &x = a.stmts[i], &y = b.stmts[i];
    if (x.kind != y.kind || x.flags != y.flags || x.begin != y.begin || x.end != y.end || x.block_end != y.block_end ||
        x.parent != y.parent || x.hint != y.hint || x.exprs_begin != y.exprs_begin)
      return false;
  }
  return true;
}

inline std::string VerifyExprs(const FileSyntax& file, size_t size) {
  std::vector<uint8_t> is_child(file.exprs.size());
  for (size_t i = 1; i < file.exprs.size(); ++i) {
    const Expr& expr = file.exprs[i];
    if (expr.begin > expr.end || expr.end > size) return At("extent of expression", i);
    if (expr.name_begin > expr.name_end || expr.name_end > size) return At("name of expression", i);
    if (size_t{expr.children_begin} + expr.children_count > file.lists.size()) return At("children of expression", i);
    for (const ExprId child : file.ChildrenOf(expr)) {
      if (child == kNoExpr) continue;
      if (child >= file.exprs.size() || file[child].parent != i) return At("parent of a child of expression", i);
      if (is_child[child]++ != 0) return At("child of two expressions", child);
      const bool is_comment = expr.kind == ExprKind::kParameter && child == file.ChildrenOf(expr)[0];
      const bool is_inside = expr.begin <= file[child].begin && file[child].end <= expr.end;
      if (!is_inside && !is_comment)
        return At("child out of its parent", child) + ": " + std::string(WordOf(file[child].kind)) + " of " +
               std::string(WordOf(expr.kind)) + " '" + std::string(file.TextOf(expr)) + "'";
    }
  }
  // Each is below one that has no parent.
  std::vector<uint8_t> is_rooted(file.exprs.size());
  std::vector<ExprId> path;
  for (ExprId i = 1; i < file.exprs.size(); ++i) {
    path.clear();
    ExprId at = i;
    for (; at != kNoExpr && is_rooted[at] == 0; at = file[at].parent) {
      path.push_back(at);
      if (path.size() > file.exprs.size()) return At("a circle around expression", i);
    }
    for (const ExprId rooted : path) is_rooted[rooted] = 1;
  }
  uint32_t behind = 0;
  for (const ExprId named : file.named) {
    const Expr& expr = file[named];
    if (expr.name_begin < behind || expr.name_end <= expr.name_begin) return At("order of name", named);
    behind = expr.name_end;
    if (file.NamedAt(expr.name_begin) != named) return At("look-up of name", named);
  }
  return "";
}

inline std::string VerifyStmts(const FileSyntax& file, size_t size) {
  if (file.stmts.empty() || file.stmts[0].kind != StmtKind::kModule || file.stmts[0].block_end != size)
    return "no module";
  size_t linked = 1;
  for (StmtId i = 0; i < file.stmts.size(); ++i) {
    const Stmt& stmt = file.stmts[i];
    if (stmt.begin > stmt.end || stmt.end > stmt.block_end || stmt.block_end > size)
      return At("extent of statement", i);
    if (i > 0 && (stmt.parent >= i || stmt.begin < file.stmts[i - 1].begin)) return At("order of statement", i);
    if (i > 0 && stmt.block_end > file.stmts[stmt.parent].block_end) return At("statement out of its block", i);
    if (size_t{stmt.exprs_begin} + stmt.exprs_count > file.lists.size()) return At("expressions of statement", i);
    if (size_t{stmt.decorator_count} + stmt.type_parameter_count > stmt.exprs_count) return At("parts of statement", i);
    StmtId previous = kModuleStmt;
    for (StmtId child = stmt.first_child; child != kModuleStmt; child = file.stmts[child].next) {
      const Stmt& of = file.stmts[child];
      if (of.parent != i || of.previous != previous || child <= previous) return At("links of statement", child);
      previous = child;
      ++linked;
    }
    const auto check = [&](ExprId expr) {
      return expr == kNoExpr ||
             (expr < file.exprs.size() && file[expr].parent == kNoExpr && file.StatementOf(expr) == i);
    };
    const auto shown = [&] {
      return ": " + std::string(WordOf(stmt.kind)) + " '" +
             std::string(file.source + stmt.begin, stmt.end - stmt.begin) + "'";
    };
    for (const ExprId expr : file.ExprsOf(stmt))
      if (!check(expr)) return At("expression of statement", i) + shown();
    // In what is broken a comment may stand where something else has begun.
    const bool may_stand_elsewhere = (stmt.flags & kStmtIsBroken) != 0 && (stmt.flags & kHintIsComment) != 0;
    if (!check(stmt.hint) && !may_stand_elsewhere) return At("hint of statement", i) + shown();
    if (stmt.name_end > stmt.name_begin && file.StatementNamedAt(stmt.name_begin) != i)
      return At("look-up of statement", i);
  }
  return linked == file.stmts.size() ? "" : "statements in no block";
}

inline std::string VerifyPlaces(const FileSyntax& file, size_t size) {
  const auto step = static_cast<uint32_t>(size / 64 + 1);
  for (uint32_t place = 0; place <= size; place += step) {
    const StmtId stmt = file.StatementAt(place);
    if (stmt >= file.stmts.size() || place > file.stmts[stmt].block_end) return At("statement at", place);
    const ExprId expr = file.ExpressionAt(place);
    if (expr >= file.exprs.size()) return At("expression at", place);
    if (expr != kNoExpr && (place < file[expr].begin || place > file[expr].end)) return At("expression at", place);
    file.NamedAt(place);
  }
  return "";
}

}  // namespace verify_syntax

// What is wrong with what a reader, which may have read other sources, says of one; empty if nothing is.
inline std::string VerifySyntax(const SourceText& source, std::span<const LineRow> rows, Version version,
                                SyntaxReader& reader) {
  FileSyntax file, again;
  reader.Read(source, rows, file);
  SyntaxReader(version).Read(source, rows, again);
  if (!verify_syntax::IsSame(file, again)) return "another reader says otherwise";
  std::string wrong = verify_syntax::VerifyExprs(file, source.size());
  if (wrong.empty()) wrong = verify_syntax::VerifyStmts(file, source.size());
  if (wrong.empty()) wrong = verify_syntax::VerifyPlaces(file, source.size());
  return wrong;
}

}  // namespace quillet
