// Outlines, symbols of the project, calls and problems.
#include <algorithm>

#include "workspace/workspace_impl.h"

namespace quillet {

std::string Workspace::Impl::NameOfScope(const SourceFile& file, uint32_t scope) {
  std::string name;
  for (; scope != kNoIndex && scope != 0; scope = file.bindings.scopes[scope].parent) {
    const NameScope& around = file.bindings.scopes[scope];
    if ((around.kind != NameScopeKind::kClass && around.kind != NameScopeKind::kFunction) || around.name == kNoIndex)
      continue;
    name = name.empty() ? std::string(file.bindings.texts[around.name])
                        : std::string(file.bindings.texts[around.name]) + "." + name;
  }
  return name;
}

std::string Workspace::Impl::QualifiedName(const Binding& binding) {
  const SourceFile* file = Get(binding.file);
  const ModuleId module = modules.OfFile(binding.file);
  std::string name = module == kNoModule ? std::string() : modules[module].name;
  if (file == nullptr) return name;
  const uint32_t index = file->OccurrenceBeginningAt(binding.offset);
  if (index == kNoIndex) return name;
  const std::string around = NameOfScope(*file, file->bindings.ScopeOf(file->bindings.occurrences[index]));
  if (!around.empty()) name += "." + around;
  return name + "." + std::string(file->bindings.TextOf(file->bindings.occurrences[index]));
}

StmtId Workspace::Impl::FunctionAround(const SourceFile& file, uint32_t offset) {
  const uint32_t index = OccurrenceAt(file, offset);
  if (index != kNoIndex) {
    const StmtId named = file.syntax.StatementNamedAt(file.bindings.occurrences[index].begin);
    if (named != kModuleStmt && file.syntax.stmt(named).kind == StmtKind::kDef) return named;
  }
  StmtId stmt = file.syntax.StatementAt(offset);
  while (stmt != kModuleStmt && file.syntax.stmt(stmt).kind != StmtKind::kDef) stmt = file.syntax.stmt(stmt).parent;
  return stmt;
}

std::vector<Workspace::Impl::Callee> Workspace::Impl::CalleesOf(const SourceFile& file, ExprId call) {
  std::vector<Callee> found;
  const ExprId function = file.syntax.ChildOf(call, 0);
  const Value callee = inference.ValueOf(file.id, function);
  const Certainty certainty = CertaintyOf(callee.doubt);
  const auto add = [&](FileId id, uint32_t offset) {
    const Binding binding = SourceOf({id, offset});
    if (std::ranges::none_of(found, [&](const Callee& other) { return other.binding == binding; }))
      found.push_back({binding, QualifiedName(binding), certainty});
  };
  const auto add_function = [&](FunctionId id) {
    const FunctionInfo info = inference.function(id);
    const SourceFile* source = Get(info.file);
    if (source == nullptr) return;
    if (info.lambda != kNoExpr) {
      const Binding binding{info.file, source->syntax[info.lambda].begin};
      const std::string around = NameOfScope(*source, source->ScopeAt(binding.offset));
      const ModuleId module = modules.OfFile(info.file);
      std::string name = module == kNoModule ? std::string() : modules[module].name;
      if (!around.empty()) name += "." + around;
      found.push_back({binding, name + ".<lambda>", certainty});
      return;
    }
    add(info.file, source->syntax.stmt(info.stmt).name_begin);
  };
  for (const TypeId id : inference.types().CopyOf(callee.set)) {
    const Type t = inference.types()[id];
    if (t.kind == TypeKind::kFunction) {
      add_function(t.a);
    } else if (t.kind == TypeKind::kClass) {
      const ClassId object = inference.ClassNamed("builtins", "object");
      const auto constructor = inference.FindMember(t.a, "__init__");
      bool has_own = false;
      if (constructor && constructor->owner != object && constructor->symbol != kNoIndex) {
        const Value init = inference.AttributeOf(inference.Just(inference.InstanceOf(t.a)), "__init__");
        for (const TypeId inner : inference.types().CopyOf(init.set)) {
          if (inference.types()[inner].kind != TypeKind::kFunction) continue;
          add_function(inference.types()[inner].a);
          has_own = true;
        }
      }
      if (!has_own) {
        const ClassInfo& info = inference.InfoOf(t.a);
        const SourceFile* source = Get(info.file);
        if (source != nullptr && info.stmt != kModuleStmt) add(info.file, source->syntax.stmt(info.stmt).name_begin);
      }
    } else if (t.kind == TypeKind::kInstance) {
      const Value method = inference.AttributeOf(inference.Just(id), "__call__");
      for (const TypeId inner : inference.types().CopyOf(method.set))
        if (inference.types()[inner].kind == TypeKind::kFunction) add_function(inference.types()[inner].a);
    }
  }
  if (!found.empty()) return found;
  const uint32_t at =
      file.syntax[function].kind == ExprKind::kAttribute || file.syntax[function].kind == ExprKind::kName
          ? file.OccurrenceBeginningAt(file.syntax[function].kind == ExprKind::kName ? file.syntax[function].begin
                                                                                     : file.syntax[function].name_begin)
          : kNoIndex;
  if (at == kNoIndex) return found;
  const Entities entities = inference.EntitiesOf(file, at);
  for (const Entity& entity : entities.found) {
    if (entity.kind == Entity::kModule) continue;
    for (const Binding& binding : inference.BindingsOf(entity)) {
      const SourceFile* source = Get(binding.file);
      const StmtId stmt = source == nullptr ? kModuleStmt : source->syntax.StatementNamedAt(binding.offset);
      if (stmt != kModuleStmt) add(binding.file, binding.offset);
    }
  }
  return found;
}

std::vector<Call> Workspace::Callees(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Call> found;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return found;
  const FileSyntax& syntax = file->syntax;
  const StmtId function = in.FunctionAround(*file, offset);
  const uint32_t begin = function == kModuleStmt ? 0 : syntax.stmt(function).end;
  const uint32_t end =
      function == kModuleStmt ? static_cast<uint32_t>(file->text().size()) : syntax.stmt(function).block_end;
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
    if (syntax[expr].kind != ExprKind::kCall || syntax[expr].begin < begin || syntax[expr].begin >= end) continue;
    StmtId around = syntax.StatementOf(expr);
    // Decorators and defaults are run by what is around the definition.
    if (around != kModuleStmt && syntax.stmt(around).kind == StmtKind::kDef &&
        syntax[expr].begin < syntax.stmt(around).end)
      around = syntax.stmt(around).parent;
    while (around != kModuleStmt && syntax.stmt(around).kind != StmtKind::kDef) around = syntax.stmt(around).parent;
    if (around != function) continue;
    in.inference.Begin();
    const ExprId called = syntax.ChildOf(expr, 0);
    Location call;
    call.file = id;
    call.begin = syntax[called].kind == ExprKind::kAttribute ? syntax[called].name_begin : syntax[called].begin;
    call.end = syntax[called].end;
    call.role = "call";
    for (const Impl::Callee& callee : in.CalleesOf(*file, expr)) {
      call.certainty = callee.certainty;
      auto at = std::ranges::find_if(found, [&](const Call& other) {
        return other.function.file == callee.binding.file && other.function.begin == callee.binding.offset;
      });
      if (at == found.end()) {
        Call made;
        made.function = in.At(callee.binding, callee.certainty);
        made.name = callee.name;
        found.push_back(std::move(made));
        at = found.end() - 1;
      }
      at->function.certainty = std::min(at->function.certainty, callee.certainty);
      at->calls.push_back(call);
    }
  }
  return found;
}

std::vector<Call> Workspace::Callers(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Call> found;
  const SourceFile* file = in.Get(id);
  const uint32_t index = file == nullptr ? kNoIndex : in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return found;
  for (const Impl::Hit& hit : in.Uses(*file, index, true)) {
    if (hit.location.role != "call") continue;
    const SourceFile* source = in.Get(hit.file);
    StmtId around = source->syntax.StatementAt(hit.location.begin);
    while (around != kModuleStmt && source->syntax.stmt(around).kind != StmtKind::kDef)
      around = source->syntax.stmt(around).parent;
    const Binding binding{hit.file, around == kModuleStmt ? 0 : source->syntax.stmt(around).name_begin};
    auto at = std::ranges::find_if(found, [&](const Call& other) {
      return other.function.file == hit.file && other.function.begin == binding.offset;
    });
    if (at == found.end()) {
      Call made;
      if (around == kModuleStmt) {
        made.function.file = hit.file;
        made.function.role = made.function.kind = "module";
        const ModuleId module = in.modules.OfFile(hit.file);
        if (module != kNoModule) made.name = in.modules[module].name;
      } else {
        made.function = in.At(binding, hit.location.certainty);
        made.name = in.QualifiedName(binding);
      }
      made.function.certainty = hit.location.certainty;
      found.push_back(std::move(made));
      at = found.end() - 1;
    }
    at->function.certainty = std::min(at->function.certainty, hit.location.certainty);
    at->calls.push_back(hit.location);
  }
  return found;
}

std::vector<OutlineItem> Workspace::Outline(FileId id) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<OutlineItem> items;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return items;
  const FileSyntax& syntax = file->syntax;
  std::unordered_map<StmtId, int> item_of;
  std::set<std::pair<int, std::string>> variables;
  for (StmtId stmt = 1; stmt < syntax.stmts.size(); ++stmt) {
    const Stmt& at = syntax.stmt(stmt);
    StmtId around = at.parent;
    while (around != kModuleStmt && !item_of.contains(around)) around = syntax.stmt(around).parent;
    const int parent = around == kModuleStmt ? -1 : item_of[around];
    if (at.kind == StmtKind::kDef || at.kind == StmtKind::kClass) {
      if (at.name_begin == at.name_end) continue;
      OutlineItem item;
      item.name = syntax.NameOf(at);
      const bool in_class = parent >= 0 && items[static_cast<size_t>(parent)].kind == "class";
      item.kind = at.kind == StmtKind::kClass ? "class" : in_class ? "method" : "function";
      const auto decorators = syntax.DecoratorsOf(at);
      item.begin = decorators.empty()
                       ? at.begin
                       : std::min(at.begin, syntax[decorators[0]].begin - (syntax[decorators[0]].begin > 0 ? 1 : 0));
      item.end = at.block_end;
      item.name_begin = at.name_begin;
      item.name_end = at.name_end;
      item.parent = parent;
      if (at.end > at.name_end) {
        Text head = Text(syntax.source + at.name_end, at.end - at.name_end);
        while (!head.empty() && (head.back() == ':' || head.back() == ' ')) head.remove_suffix(1);
        static constexpr size_t kMaxHead = 200;
        std::string detail;
        for (const char c : head.substr(0, kMaxHead)) {
          const bool is_blank = c == ' ' || c == '\n' || c == '\r' || c == '\t';
          if (!is_blank || (!detail.empty() && detail.back() != ' ')) detail += is_blank ? ' ' : c;
        }
        item.detail = detail;
      }
      item_of[stmt] = static_cast<int>(items.size());
      items.push_back(std::move(item));
      continue;
    }
    if (at.kind != StmtKind::kAssign && at.kind != StmtKind::kAnnotated && at.kind != StmtKind::kTypeAlias) continue;
    if (parent >= 0 && items[static_cast<size_t>(parent)].kind != "class") continue;
    const auto exprs = syntax.ExprsOf(at);
    for (size_t i = 0; i < exprs.size(); ++i) {
      const ExprId target = exprs[i];
      const bool is_target = at.kind == StmtKind::kTypeAlias ? i == 0 : (syntax[target].flags & kIsTarget) != 0;
      if (!is_target || syntax[target].kind != ExprKind::kName) continue;
      std::string name(syntax.TextOf(syntax[target]));
      if (!variables.emplace(parent, name).second) continue;
      OutlineItem item;
      item.name = std::move(name);
      item.kind = parent >= 0 ? "attribute" : "variable";
      item.begin = at.begin;
      item.end = at.end;
      item.name_begin = syntax[target].begin;
      item.name_end = syntax[target].end;
      item.parent = parent;
      items.push_back(std::move(item));
    }
  }
  return items;
}

std::vector<SymbolInfo> Workspace::Symbols(Text query, size_t most) {
  Impl& in = *impl_;
  in.Begin();
  struct Ranked {
    int rank;
    SymbolInfo symbol;
  };
  std::vector<Ranked> found;
  const auto lower = [](char c) { return static_cast<char>(std::tolower(static_cast<unsigned char>(c))); };
  // 0 exact, 1 but for case, 2 prefix, 3 part, 4 its letters in order; -1 not at all.
  const auto match = [&](Text name) {
    if (name == query) return 0;
    const auto same = [&](char a, char b) { return lower(a) == lower(b); };
    if (std::ranges::equal(name, query, same)) return 1;
    if (name.size() >= query.size() && std::ranges::equal(name.substr(0, query.size()), query, same)) return 2;
    if (!std::ranges::search(name, query, same).empty()) return 3;
    size_t at = 0;
    for (const char c : name)
      if (at < query.size() && lower(c) == lower(query[at])) ++at;
    return at == query.size() ? 4 : -1;
  };
  for (const FileId id : in.project.All()) {
    const SourceFile* file = in.Get(id);
    if (file == nullptr) continue;
    for (const Occurrence& occurrence : file->bindings.occurrences) {
      if (occurrence.kind != NameKind::kClass && occurrence.kind != NameKind::kFunction &&
          occurrence.kind != NameKind::kVariable)
        continue;
      if (!occurrence.has_symbol) continue;
      const uint32_t scope = file->bindings.ScopeOf(occurrence);
      const NameScopeKind kind = file->bindings.scopes[scope].kind;
      const bool is_variable = occurrence.kind == NameKind::kVariable;
      if (is_variable && kind != NameScopeKind::kModule && kind != NameScopeKind::kClass) continue;
      const Text name = file->bindings.TextOf(occurrence);
      const int rank = match(name);
      if (rank < 0) continue;
      if (is_variable && file->occurrences().Of(file->bindings.VariableOf(occurrence)).front() !=
                             static_cast<uint32_t>(&occurrence - file->bindings.occurrences.data()))
        continue;
      SymbolInfo symbol;
      symbol.name = name;
      symbol.kind = occurrence.kind == NameKind::kClass      ? "class"
                    : occurrence.kind == NameKind::kFunction ? (kind == NameScopeKind::kClass ? "method" : "function")
                                                             : "variable";
      const ModuleId module = in.modules.OfFile(id);
      symbol.container = module == kNoModule ? std::string() : in.modules[module].name;
      const std::string around = in.NameOfScope(*file, scope);
      if (!around.empty()) symbol.container += "." + around;
      symbol.file = id;
      symbol.begin = occurrence.begin;
      symbol.end = file->bindings.EndOf(occurrence);
      found.push_back({rank * 2 + (is_variable ? 1 : 0), std::move(symbol)});
    }
  }
  std::ranges::stable_sort(found, [](const Ranked& a, const Ranked& b) {
    return std::pair(a.rank, a.symbol.name.size()) < std::pair(b.rank, b.symbol.name.size());
  });
  std::vector<SymbolInfo> symbols;
  for (Ranked& ranked : found) {
    if (symbols.size() >= most) break;
    symbols.push_back(std::move(ranked.symbol));
  }
  return symbols;
}

std::vector<Location> Workspace::Named(Text dotted) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Location> found;
  const size_t dot = dotted.rfind('.');
  const Text last = dot == Text::npos ? dotted : dotted.substr(dot + 1);
  const Text rest = dot == Text::npos ? Text() : dotted.substr(0, dot);
  for (const FileId id : in.project.WithWords({last})) {
    const SourceFile* file = in.Get(id);
    if (file == nullptr) continue;
    for (uint32_t i = 0; i < file->bindings.occurrences.size(); ++i) {
      const Occurrence& occurrence = file->bindings.occurrences[i];
      if (file->bindings.TextOf(occurrence) != last) continue;
      const bool is_self = occurrence.is_attribute && occurrence.role == NameRole::kWrite;
      if (!is_self && (occurrence.kind == NameKind::kNone || occurrence.kind == NameKind::kImport ||
                       occurrence.kind == NameKind::kParameter))
        continue;
      uint32_t scope = file->bindings.ScopeOf(occurrence);
      if (is_self) scope = file->bindings.scopes[scope].parent;
      if (scope == kNoIndex) continue;
      const ModuleId module = in.modules.OfFile(id);
      std::string full = module == kNoModule ? std::string() : in.modules[module].name;
      const std::string around = in.NameOfScope(*file, scope);
      if (!around.empty()) full += "." + around;
      const bool fits =
          rest.empty() ? around.empty() || !is_self : full == rest || full.ends_with("." + std::string(rest));
      if (fits) found.push_back(in.At({id, occurrence.begin}, Certainty::kCertain));
    }
  }
  in.Sort(found);
  return found;
}

}  // namespace quillet
