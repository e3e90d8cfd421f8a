// Questions to the statements and expressions of a file by where they stand: searches in what is sorted
// anyway. Statements stand in the order of where they begin, and so do the children of an expression.
#include "syntax/syntax.h"

#include <algorithm>
#include <iterator>

namespace quillet {

namespace {

constexpr Text kExprWords[] = {
    "Missing",
    "Name",
    "Number",
    "String",
    "Constant",
    "Attribute",
    "Subscript",
    "Slice",
    "Call",
    "Keyword",
    "Starred",
    "DoubleStarred",
    "Tuple",
    "List",
    "Set",
    "Dict",
    "Unary",
    "Binary",
    "Boolean",
    "Compare",
    "Conditional",
    "Lambda",
    "Parameter",
    "ListComprehension",
    "SetComprehension",
    "DictComprehension",
    "Generator",
    "ComprehensionFor",
    "Await",
    "Yield",
    "YieldFrom",
    "Named",
    "Backquote",
    "ModulePath",
    "ImportAlias",
    "WithItem",
    "PatternCapture",
    "PatternStar",
    "PatternValue",
    "PatternClass",
    "PatternSequence",
    "PatternMapping",
    "PatternOr",
    "PatternAs",
    "TypeParameter",
    "SignatureHint",
};
static_assert(std::size(kExprWords) == static_cast<size_t>(ExprKind::kSignatureHint) + 1);

constexpr Text kStmtWords[] = {
    "Module",    "Expression", "Assign",     "AugmentedAssign",
    "Annotated", "Return",     "Delete",     "Raise",
    "Assert",    "Import",     "FromImport", "Global",
    "Nonlocal",  "TypeAlias",  "Print",      "Exec",
    "Pass",      "For",        "While",      "If",
    "Elif",      "Else",       "Try",        "Except",
    "Finally",   "With",       "Match",      "Case",
    "Def",       "Class",      "Broken",
};
static_assert(std::size(kStmtWords) == static_cast<size_t>(StmtKind::kBroken) + 1);

}  // namespace

Text WordOf(ExprKind kind) { return kExprWords[static_cast<size_t>(kind)]; }
Text WordOf(StmtKind kind) { return kStmtWords[static_cast<size_t>(kind)]; }

StmtId FileSyntax::LastBegunAt(uint32_t offset) const {
  const auto behind = std::upper_bound(stmts.begin() + 1, stmts.end(), offset,
                                       [](uint32_t place, const Stmt& stmt) { return place < stmt.begin; });
  const auto next = static_cast<StmtId>(behind - stmts.begin());
  if (next < stmts.size() && stmts[next].decorator_count > 0) {
    // The first decorator, with its sign.
    uint32_t begin = exprs[lists[stmts[next].exprs_begin]].begin;
    while (begin > 0 && source[--begin] != '@') {
    }
    if (begin <= offset) return next;
  }
  return next - 1;
}

StmtId FileSyntax::StatementAt(uint32_t offset) const {
  if (stmts.empty()) return kModuleStmt;
  StmtId stmt = LastBegunAt(offset);
  while (stmt != kModuleStmt && stmts[stmt].block_end < offset) stmt = stmts[stmt].parent;
  return stmt;
}

// `expr` or one in it, where it holds the place.
// The last of a list that begins there or in front, if it holds the place. Few are searched one by one, for the odd
// one that is out of order: a hint in a comment.
ExprId FileSyntax::HoldingAt(std::span<const ExprId> list, uint32_t offset) const {
  const auto holds = [this, offset](ExprId id) { return exprs[id].begin <= offset && offset <= exprs[id].end; };
  constexpr size_t kFew = 8;
  ExprId found = kNoExpr;
  if (list.size() <= kFew) {
    for (const ExprId expr : list) {
      if (expr == kNoExpr || !holds(expr)) continue;
      if (found == kNoExpr || exprs[expr].begin >= exprs[found].begin) found = expr;
    }
    return found;
  }
  size_t begin = 0;
  size_t end = list.size();
  while (begin < end) {
    const size_t middle = begin + (end - begin) / 2;
    size_t at = middle;
    while (at > begin && list[at] == kNoExpr) --at;
    if (list[at] == kNoExpr || exprs[list[at]].begin <= offset) {
      if (list[at] != kNoExpr) found = list[at];
      begin = middle + 1;
    } else {
      end = at;
    }
  }
  return found != kNoExpr && holds(found) ? found : kNoExpr;
}

ExprId FileSyntax::InnermostAt(ExprId expr, uint32_t offset) const {
  while (true) {
    const ExprId found = HoldingAt(ChildrenOf(expr), offset);
    if (found == kNoExpr) return expr;
    expr = found;
  }
}

ExprId FileSyntax::ExpressionAt(uint32_t offset) const {
  if (stmts.empty()) return kNoExpr;
  // A type comment stands behind the end of its statement, and what is left over of a head stands in its
  // block and in front of its end.
  for (StmtId at = LastBegunAt(offset); at != kModuleStmt; at = stmts[at].parent) {
    const Stmt& stmt = stmts[at];
    const ExprId parts[] = {HoldingAt(ExprsOf(stmt), offset), stmt.hint};
    const ExprId found = HoldingAt(parts, offset);
    if (found != kNoExpr) return InnermostAt(found, offset);
    if (offset > stmts[stmt.parent].end) break;
  }
  return kNoExpr;
}

std::string FileSyntax::DottedNameOf(ExprId path, size_t parts) const {
  std::string dotted;
  for (const ExprId part : ChildrenOf(path)) {
    if (parts-- == 0) break;
    if (!dotted.empty()) dotted += '.';
    dotted += NameOf(part);
  }
  return dotted;
}

ExprId FileSyntax::NamedAt(uint32_t offset) const {
  const auto found = std::lower_bound(named.begin(), named.end(), offset,
                                      [this](ExprId expr, uint32_t at) { return exprs[expr].name_begin < at; });
  return found != named.end() && exprs[*found].name_begin == offset ? *found : kNoExpr;
}

StmtId FileSyntax::StatementNamedAt(uint32_t offset) const {
  if (stmts.empty()) return kModuleStmt;
  const auto behind = std::upper_bound(stmts.begin() + 1, stmts.end(), offset,
                                       [](uint32_t place, const Stmt& stmt) { return place < stmt.begin; });
  const Stmt& stmt = behind[-1];
  const bool is_named = stmt.name_begin == offset && stmt.name_end > offset;
  return is_named ? static_cast<StmtId>(behind - stmts.begin() - 1) : kModuleStmt;
}

StmtId FileSyntax::StatementOf(ExprId expr) const {
  if (expr == kNoExpr || stmts.empty()) return kModuleStmt;
  const uint32_t begin = exprs[expr].begin;
  const StmtId stmt = LastBegunAt(begin);
  if (stmts[stmt].begin == begin && exprs[expr].end == begin && stmts[stmt].decorator_count == 0) {
    // What is missing may end the statement in front of the one that begins there.
    while (exprs[expr].parent != kNoExpr) expr = exprs[expr].parent;
    return exprs[expr].end > begin ? stmt : stmt - 1;
  }
  // What is left over of a head stands in front of the comment that says what the head is.
  const bool is_behind = stmts[stmt].kind == StmtKind::kBroken && stmts[stmt].end < begin;
  return is_behind ? stmts[stmt].parent : stmt;
}

size_t FileSyntax::ByteSize() const {
  return sizeof(*this) + exprs.capacity() * sizeof(Expr) + stmts.capacity() * sizeof(Stmt) +
         (lists.capacity() + named.capacity()) * sizeof(ExprId);
}

void FileSyntax::Clear() {
  exprs.clear();
  stmts.clear();
  lists.clear();
  named.clear();
  source = nullptr;
  has_lambdas = false;
}

}  // namespace quillet
