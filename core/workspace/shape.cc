// Folds and selections: what of a file belongs together, by its lines and by its places.
#include <algorithm>
#include <map>

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

bool IsImport(StmtKind kind) { return kind == StmtKind::kImport || kind == StmtKind::kFromImport; }

class Folder {
 public:
  explicit Folder(const SourceFile& file) : file_(file), syntax_(file.syntax) {}

  std::vector<Fold> Folds() {
    AddBlocks();
    AddImports();
    AddExpressions();
    AddComments();
    std::vector<Fold> folds;
    for (const auto& [first, fold] : by_line_) folds.push_back(fold);
    return folds;
  }

 private:
  int LineOf(uint32_t offset) const { return file_.PlaceOf(offset).line; }

  // The longest that begins on a line is kept.
  void Add(int first, int last, Text kind = Text("")) {
    if (last <= first) return;
    const auto [at, is_new] = by_line_.try_emplace(first, Fold{first, last, kind});
    if (!is_new && at->second.last_line < last) at->second = {first, last, kind};
  }

  void AddBlocks() {
    for (StmtId stmt = 1; stmt < syntax_.stmts.size(); ++stmt) {
      const Stmt& at = syntax_.stmt(stmt);
      if (at.first_child != kModuleStmt) Add(LineOf(at.begin), LineOf(at.block_end));
    }
  }

  // Those that stand one behind the other.
  void AddImports() {
    for (StmtId stmt = 1; stmt < syntax_.stmts.size(); ++stmt) {
      const Stmt& first = syntax_.stmt(stmt);
      if (!IsImport(first.kind) || (first.previous != kModuleStmt && IsImport(syntax_.stmt(first.previous).kind)))
        continue;
      StmtId last = stmt;
      while (syntax_.stmt(last).next != kModuleStmt && IsImport(syntax_.stmt(syntax_.stmt(last).next).kind))
        last = syntax_.stmt(last).next;
      if (last != stmt) Add(LineOf(first.begin), LineOf(syntax_.stmt(last).end), "imports");
    }
  }

  void AddExpressions() {
    for (ExprId expr = 1; expr < syntax_.exprs.size(); ++expr) {
      const Expr& at = syntax_[expr];
      if (at.end <= at.begin) continue;
      switch (at.kind) {
        case ExprKind::kString: {
          const bool stands_alone =
              at.parent == kNoExpr && syntax_.stmt(syntax_.StatementOf(expr)).kind == StmtKind::kExpression;
          Add(LineOf(at.begin), LineOf(at.end), stands_alone ? Text("comment") : Text(""));
          break;
        }
        case ExprKind::kTuple:
        case ExprKind::kList:
        case ExprKind::kSet:
        case ExprKind::kDict:
        case ExprKind::kCall:
        case ExprKind::kSubscript:
        case ExprKind::kListComprehension:
        case ExprKind::kSetComprehension:
        case ExprKind::kDictComprehension:
        case ExprKind::kGenerator:
          // The line of the closing bracket stays.
          Add(LineOf(at.begin), LineOf(at.end) - 1);
          break;
        default:
          break;
      }
    }
  }

  void AddComments() {
    const Text text = file_.text();
    const std::vector<uint32_t>& starts = file_.bindings.line_starts;
    std::vector<int> regions;
    int first = 0;  // of the comment lines up to here
    for (size_t i = 0; i <= starts.size(); ++i) {
      const int line = static_cast<int>(i) + 1;
      size_t at = i < starts.size() ? starts[i] : text.size();
      while (at < text.size() && (text[at] == ' ' || text[at] == '\t')) ++at;
      const bool is_comment = at < text.size() && text[at] == '#' && !IsInString(static_cast<uint32_t>(at));
      if (!is_comment) {
        if (first != 0) Add(first, line - 1, "comment");
        first = 0;
        continue;
      }
      if (first == 0) first = line;
      ++at;
      while (at < text.size() && text[at] == ' ') ++at;
      const Text word = text.substr(at, 9);
      if (word.starts_with("region")) {
        regions.push_back(line);
      } else if (word.starts_with("endregion") && !regions.empty()) {
        Add(regions.back(), line, "region");
        regions.pop_back();
      }
    }
  }

  bool IsInString(uint32_t offset) const {
    const ExprId expr = syntax_.ExpressionAt(offset);
    return expr != kNoExpr && syntax_[expr].kind == ExprKind::kString && syntax_[expr].begin < offset &&
           offset < syntax_[expr].end;
  }

  const SourceFile& file_;
  const FileSyntax& syntax_;
  std::map<int, Fold> by_line_;
};

}  // namespace

std::vector<Fold> Workspace::Folds(FileId id) {
  impl_->Begin();
  const SourceFile* file = impl_->Get(id);
  return file == nullptr ? std::vector<Fold>() : Folder(*file).Folds();
}

std::vector<Span> Workspace::Selections(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Span> found;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return found;
  const FileSyntax& syntax = file->syntax;
  // Only what is larger than all in front of it.
  const auto add = [&](uint32_t begin, uint32_t end) {
    if (begin > offset || end < offset || begin == end) return;
    if (!found.empty() && (begin > found.back().begin || end < found.back().end ||
                           (begin == found.back().begin && end == found.back().end)))
      return;
    found.push_back({begin, end});
  };
  if (const uint32_t index = in.OccurrenceAt(*file, offset); index != kNoIndex) {
    const Occurrence& occurrence = file->bindings.occurrences[index];
    add(occurrence.begin, file->bindings.EndOf(occurrence));
  }
  for (ExprId expr = syntax.ExpressionAt(offset); expr != kNoExpr; expr = syntax[expr].parent)
    add(syntax[expr].begin, syntax[expr].end);
  for (StmtId stmt = syntax.StatementAt(offset); stmt != kModuleStmt; stmt = syntax.stmt(stmt).parent) {
    const Stmt& at = syntax.stmt(stmt);
    add(at.begin, at.end);
    if (at.first_child != kModuleStmt) add(syntax.stmt(at.first_child).begin, at.block_end);
    add(at.begin, at.block_end);
    const auto decorators = syntax.DecoratorsOf(at);
    if (!decorators.empty() && syntax[decorators[0]].begin > 0)
      add(std::min(at.begin, syntax[decorators[0]].begin - 1), at.block_end);
  }
  add(0, static_cast<uint32_t>(file->text().size()));
  return found;
}

}  // namespace quillet
