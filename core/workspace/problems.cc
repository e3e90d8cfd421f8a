// What is wrong with a file: errors of syntax, imports of nothing, names that nothing binds.
#include <algorithm>
#include <array>

#include "foundations/console.h"
#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

// Names that a module has without binding them.
constexpr std::array<Text, 14> kModuleNames{"__name__",     "__file__",   "__doc__",  "__path__",    "__package__",
                                            "__builtins__", "__loader__", "__spec__", "__dict__",    "__debug__",
                                            "__class__",    "__module__", "__all__",  "__qualname__"};

}  // namespace

std::vector<Problem> Workspace::Problems(FileId id) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Problem> problems;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return problems;
  if (in.settings.analyzer != nullptr && !file->is_stub) {
    if (in.analyzer == nullptr) in.analyzer = std::make_unique<FileAnalyzer>(*in.settings.analyzer);
    // What the analysis says of itself, such as that a statement is too deep to be walked whole, is no problem of the
    // file.
    Console silent{[](Text) {}, [](const std::exception_ptr&, bool) {}, TheConsole().describe_exception};
    const ThreadConsole own_console(&silent);
    try {
      in.analyzer->Analyze(file->text());
      const auto& results = in.analyzer->results();
      for (size_t row = 0; row < results.size(); ++row) {
        if (results[row].error < 0) continue;
        const FileAnalyzer::Failure& failure = in.analyzer->errors()[static_cast<size_t>(results[row].error)];
        const Position place = in.analyzer->ErrorPosition(row);
        Problem problem;
        problem.begin = file->OffsetOf(place.line + 1, place.col + 1);
        const uint32_t token = in.OccurrenceAt(*file, problem.begin);
        problem.end = token != kNoIndex && file->bindings.occurrences[token].begin == problem.begin
                          ? file->bindings.EndOf(file->bindings.occurrences[token])
                          : std::min(problem.begin + 1, static_cast<uint32_t>(file->text().size()));
        problem.code = "syntax";
        problem.message = failure.message();
        problems.push_back(std::move(problem));
      }
    } catch (const std::exception&) {
      // Too large to be looked through.
    }
  }
  const Bindings& bindings = file->bindings;
  const bool has_star =
      std::ranges::any_of(bindings.scopes, [](const NameScope& scope) { return scope.has_star_import; });
  const ModuleId builtins = in.modules.Find("builtins");
  std::unordered_map<uint32_t, bool> is_unbound;
  for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
    const Occurrence& occurrence = bindings.occurrences[i];
    if (occurrence.role == NameRole::kImport) {
      const ExprId named = file->syntax.NamedAt(occurrence.begin);
      if (named == kNoExpr || file->syntax[named].parent == kNoExpr) continue;
      // One that is tried, or never reached, may be missing.
      bool is_tried = false;
      for (StmtId stmt = file->syntax.StatementAt(occurrence.begin); stmt != kModuleStmt;
           stmt = file->syntax.stmt(stmt).parent)
        is_tried = is_tried || file->syntax.stmt(stmt).kind == StmtKind::kTry ||
                   file->syntax.stmt(stmt).kind == StmtKind::kExcept;
      if (is_tried || !in.inference.IsReachable(*file, file->syntax.StatementAt(occurrence.begin))) continue;
      const bool is_path = file->syntax[file->syntax[named].parent].kind == ExprKind::kModulePath;
      const Entities entities = in.inference.EntitiesOfImport(*file, occurrence.begin);
      if (!entities.found.empty() || (entities.doubt & Value::kOpen) != 0) continue;
      // Only the first part that is not there, and no name of a module that is not there.
      if (is_path) {
        const auto parts = file->syntax.ChildrenOf(file->syntax[named].parent);
        const auto at = std::ranges::lower_bound(parts, occurrence.begin, {},
                                                 [&](ExprId part) { return file->syntax[part].begin; });
        if (at != parts.begin() && in.inference.EntitiesOfImport(*file, file->syntax[*(at - 1)].begin).found.empty())
          continue;
      } else {
        const StmtId stmt = file->syntax.StatementOf(named);
        const auto exprs = file->syntax.ExprsOf(file->syntax.stmt(stmt));
        if (file->syntax.stmt(stmt).kind != StmtKind::kFromImport || exprs.empty()) continue;
        const auto parts = file->syntax.ChildrenOf(exprs[0]);
        if (!parts.empty() && in.inference.EntitiesOfImport(*file, file->syntax[parts.back()].begin).found.empty())
          continue;
      }
      const std::string name(bindings.TextOf(occurrence));
      problems.push_back({occurrence.begin, bindings.EndOf(occurrence), "unresolved-import",
                          (is_path ? "no module named '" : "nothing is named '") + name + (is_path ? "'" : "' there")});
      continue;
    }
    if (!occurrence.has_symbol || has_star || occurrence.binds() ||
        (occurrence.flags & (kNameString | kNameComment)) != 0 ||
        (occurrence.role != NameRole::kRead && occurrence.role != NameRole::kCall))
      continue;
    const uint32_t variable = bindings.VariableOf(occurrence);
    const auto [known, is_new] = is_unbound.try_emplace(variable, false);
    if (is_new) {
      const Text name = bindings.texts[bindings.symbols[variable].name];
      const bool is_bound = std::ranges::any_of(file->occurrences().Of(variable), [&](uint32_t at) {
        return bindings.occurrences[at].binds() || bindings.occurrences[at].role == NameRole::kDeclaration;
      });
      known->second = !is_bound && std::ranges::find(kModuleNames, name) == kModuleNames.end() &&
                      builtins != kNoModule && !in.inference.IsBuiltin(name);
    }
    if (!known->second) continue;
    problems.push_back({occurrence.begin, bindings.EndOf(occurrence), "unbound-name",
                        "nothing binds the name '" + std::string(bindings.TextOf(occurrence)) + "'"});
  }
  std::ranges::sort(problems, {}, [](const Problem& problem) { return std::pair(problem.begin, problem.end); });
  return problems;
}

}  // namespace quillet
