// A file's statements and expressions as short text, for tests.
//
// A statement is a line, those of its block are indented below: word, name, expressions, [: hint], flags.
// An expression is its name or its text where it is one token, otherwise (Word name child...); kNoExpr is "-",
// what is missing "?". Flags: "!" broken, "()" in brackets, "=" a target.
#pragma once

#include <string>
#include <vector>

#include "lines/cutter.h"
#include "syntax/reader.h"

namespace quillet::testing {

inline std::string ExprText(const FileSyntax& file, ExprId id) {
  if (id == kNoExpr) return "-";
  const Expr& expr = file[id];
  const std::string name(file.NameOf(expr));
  std::string text;
  switch (expr.kind) {
    case ExprKind::kMissing:
      return expr.begin == expr.end ? "?" : "?..";
    case ExprKind::kName:
      text = name;
      break;
    case ExprKind::kNumber:
    case ExprKind::kConstant:
      text = file.TextOf(expr);
      break;
    default:
      if (expr.kind == ExprKind::kString && expr.children_count == 0) {
        text = file.TextOf(expr);
        break;
      }
      text = "(" + std::string(WordOf(expr.kind));
      if (expr.op != 0) text += "#" + std::to_string(expr.op);
      if (!name.empty()) text += " '" + name + "'";
      for (const ExprId child : file.ChildrenOf(expr)) text += " " + ExprText(file, child);
      text += ")";
  }
  if ((expr.flags & kIsTarget) != 0) text += "=";
  if ((expr.flags & kIsBroken) != 0) text += "!";
  if ((expr.flags & kParenthesized) != 0) text += "()";
  if ((expr.flags & kTrailingComma) != 0) text += ",";
  if ((expr.flags & kIsStar) != 0) text += "*";
  if ((expr.flags & kAsyncClause) != 0) text += "~";
  if ((expr.flags & kHoldsHint) != 0) text += ":";
  return text;
}

inline void AppendBlockText(const FileSyntax& file, StmtId block, size_t indent, std::string& text) {
  for (StmtId id = file.stmt(block).first_child; id != kModuleStmt; id = file.stmt(id).next) {
    const Stmt& stmt = file.stmt(id);
    text.append(indent, ' ').append(WordOf(stmt.kind));
    if ((stmt.flags & kAsyncStmt) != 0) text += "~";
    if ((stmt.flags & kExceptGroup) != 0) text += "*";
    if ((stmt.flags & kHasYield) != 0) text += " yields";
    if ((stmt.flags & kHasReturnValue) != 0) text += " returns";
    if ((stmt.flags & kStmtIsBroken) != 0) text += "!";
    if (stmt.name_end > stmt.name_begin) text.append(" '").append(file.NameOf(stmt)).append("'");
    for (const ExprId expr : file.DecoratorsOf(stmt)) text += " @" + ExprText(file, expr);
    for (const ExprId expr : file.TypeParametersOf(stmt)) text += " [" + ExprText(file, expr) + "]";
    for (const ExprId expr : file.ArgumentsOf(stmt)) text += " " + ExprText(file, expr);
    if (stmt.hint != kNoExpr) text += ((stmt.flags & kHintIsComment) != 0 ? " #: " : " : ") + ExprText(file, stmt.hint);
    text += "\n";
    AppendBlockText(file, id, indent + 2, text);
  }
}

struct ReadSource {
  explicit ReadSource(Text bytes, Version version = Version::Of(3, 14)) : source(SourceText::Copy(bytes)) {
    CutLines(*source, version, rows);
    SyntaxReader(version).Read(*source, rows, file);
  }
  std::string text() const {
    std::string text;
    AppendBlockText(file, kModuleStmt, 0, text);
    return text;
  }

  Ref<SourceText> source;
  std::vector<LineRow> rows;
  FileSyntax file;
};

inline std::string SyntaxText(Text bytes, Version version = Version::Of(3, 14)) {
  return ReadSource(bytes, version).text();
}

}  // namespace quillet::testing
