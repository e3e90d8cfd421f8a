// What can stand at a place.
#include <algorithm>
#include <array>

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

bool IsNameByte(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_' || static_cast<unsigned char>(c) >= 0x80;
}

bool Fits(Text name, Text prefix) {
  if (prefix.size() > name.size()) return false;
  return std::ranges::equal(name.substr(0, prefix.size()), prefix, [](char a, char b) {
    return std::tolower(static_cast<unsigned char>(a)) == std::tolower(static_cast<unsigned char>(b));
  });
}

constexpr std::array kKeywords{"False", "None",     "True",  "and",    "as",   "assert", "async",  "await",    "break",
                               "class", "continue", "def",   "del",    "elif", "else",   "except", "finally",  "for",
                               "from",  "global",   "if",    "import", "in",   "is",     "lambda", "nonlocal", "not",
                               "or",    "pass",     "raise", "return", "try",  "while",  "with",   "yield"};

}  // namespace

std::string Workspace::Impl::KindOfSymbol(const SourceFile& file, uint32_t symbol, bool in_class) {
  for (const uint32_t i : file.occurrences().Of(symbol)) {
    switch (file.bindings.occurrences[i].kind) {
      case NameKind::kClass:
        return "class";
      case NameKind::kFunction: {
        if (!in_class) return "function";
        const StmtId stmt = file.syntax.StatementNamedAt(file.bindings.occurrences[i].begin);
        if (stmt != kModuleStmt)
          for (const ExprId decorator : file.syntax.DecoratorsOf(file.syntax.stmt(stmt)))
            if (file.syntax.NameOf(decorator).ends_with("property")) return "property";
        return "method";
      }
      case NameKind::kParameter:
        return "parameter";
      case NameKind::kImport: {
        for (const Entity& entity : inference.EntitiesOfImport(file, file.bindings.occurrences[i].begin).found) {
          if (entity.kind == Entity::kModule) return "module";
          if (entity.kind == Entity::kVariable && Get(entity.a) != nullptr &&
              (entity.a != file.id || entity.b != symbol))
            return KindOfSymbol(*Get(entity.a), entity.b, false);
        }
        return "variable";
      }
      case NameKind::kVariable:
      case NameKind::kTypeParameter:
      case NameKind::kTypeAlias:
        return in_class ? "attribute" : "variable";
      case NameKind::kNone:
        continue;
    }
  }
  return "variable";
}

void Workspace::Impl::AddMembers(Value receiver, Text prefix, std::vector<Completion>& found) {
  std::unordered_set<std::string> seen;
  for (const Completion& completion : found) seen.insert(completion.name);
  const Certainty certainty = CertaintyOf(receiver.doubt);
  const auto add = [&](Text name, std::string kind, Text owner) {
    if (!Fits(name, prefix) || !seen.insert(std::string(name)).second) return;
    found.push_back({std::string(name), std::move(kind), std::string(owner), {}, certainty});
  };
  const auto add_class = [&](ClassId cls, bool on_class) {
    const std::vector<BaseClass> order = inference.InfoOf(cls).order;
    for (const BaseClass& entry : order) {
      const ClassInfo& info = inference.MembersOf(entry.cls);
      const SourceFile* file = Get(info.file);
      if (file == nullptr) continue;
      std::vector<std::pair<uint32_t, Text>> symbols;
      for (const auto& [name, symbol] : info.symbols) symbols.emplace_back(symbol, name);
      std::ranges::sort(symbols);
      for (const auto& [symbol, name] : symbols) add(name, KindOfSymbol(*file, symbol, true), info.name);
      if (!on_class || true) {
        std::vector<std::pair<uint32_t, Text>> written;
        for (const auto& [name, offsets] : info.self_attributes) written.emplace_back(offsets.front(), name);
        std::ranges::sort(written);
        for (const auto& [offset, name] : written) add(name, "attribute", info.name);
      }
      if (info.call != kNoExpr)
        for (const MadeField& field : info.fields) add(field.name, "attribute", info.name);
    }
  };
  for (const TypeId id : inference.types().CopyOf(receiver.set)) {
    const Type t = inference.types()[id];
    if (t.kind == TypeKind::kModule) {
      AddModuleNames(t.a, prefix, found, true);
      continue;
    }
    if (t.kind == TypeKind::kClass) {
      add_class(t.a, true);
      if (const ClassId metaclass = inference.ClassOfType(id); metaclass != kNoId) add_class(metaclass, false);
      continue;
    }
    if (t.kind == TypeKind::kSuper) {
      for (const TypeId self : inference.types().CopyOf(inference.types().ArgOf(id, 0))) {
        const ClassId cls = inference.ClassOfType(self);
        const ClassId own = inference.types()[self].kind == TypeKind::kClass ? inference.types()[self].a : cls;
        if (own == kNoId) continue;
        const std::vector<BaseClass> order = inference.InfoOf(own).order;
        for (size_t i = 0; i < order.size(); ++i)
          if (order[i].cls == t.a && i + 1 < order.size()) add_class(order[i + 1].cls, false);
      }
      continue;
    }
    if (t.kind == TypeKind::kTypeForm) {
      AddMembers({inference.types().ArgOf(id, 0), receiver.doubt}, prefix, found);
      continue;
    }
    const ClassId cls = inference.ClassOfType(id);
    if (cls != kNoId) add_class(cls, false);
  }
}

void Workspace::Impl::AddModuleNames(ModuleId module, Text prefix, std::vector<Completion>& found, bool with_private) {
  std::unordered_set<std::string> seen;
  for (const Completion& completion : found) seen.insert(completion.name);
  std::vector<ModuleId> pending{module};
  std::set<ModuleId> visited;
  while (!pending.empty()) {
    const ModuleId at = pending.back();
    pending.pop_back();
    if (!visited.insert(at).second) continue;
    const FileId id = inference.FileOfModule(at);
    const SourceFile* file = id == kNoFile ? nullptr : Get(id);
    if (file == nullptr) continue;
    const Bindings& bindings = file->bindings;
    for (uint32_t symbol = bindings.scopes[0].first_symbol; symbol != kNoIndex;
         symbol = bindings.symbols[symbol].next) {
      const Text name = bindings.texts[bindings.symbols[symbol].name];
      if (!Fits(name, prefix) || seen.contains(std::string(name))) continue;
      bool binds = false, is_import = false, is_re_export = !file->is_stub;
      for (const uint32_t i : file->occurrences().Of(symbol)) {
        const Occurrence& occurrence = bindings.occurrences[i];
        if (occurrence.kind == NameKind::kNone) continue;
        if (!inference.IsReachable(*file, file->syntax.StatementAt(occurrence.begin))) continue;
        binds = true;
        if (occurrence.kind == NameKind::kImport) is_import = true;
        if (occurrence.kind == NameKind::kImport && occurrence.role == NameRole::kDefinition) is_re_export = true;
        if (occurrence.kind != NameKind::kImport) is_re_export = true;
      }
      if (!binds || (is_import && !is_re_export) || (at != module && name.starts_with('_'))) continue;
      if (!with_private && name.starts_with('_') && prefix.empty()) continue;
      seen.insert(std::string(name));
      found.push_back(
          {std::string(name), KindOfSymbol(*file, symbol, false), modules[at].name, {}, Certainty::kCertain});
    }
    for (StmtId stmt = 1; stmt < file->syntax.stmts.size(); ++stmt) {
      const auto exprs = file->syntax.ExprsOf(file->syntax.stmt(stmt));
      if (file->syntax.stmt(stmt).kind != StmtKind::kFromImport || exprs.size() < 2 ||
          (file->syntax[exprs[1]].flags & kIsStar) == 0)
        continue;
      std::string dotted;
      for (const ExprId part : file->syntax.ChildrenOf(exprs[0])) {
        if (!dotted.empty()) dotted += '.';
        dotted += file->syntax.NameOf(part);
      }
      const ModuleId other = modules.FindFrom(id, file->syntax[exprs[0]].op, dotted);
      if (other != kNoModule) pending.push_back(other);
    }
  }
  for (std::string& name : modules.ChildNames(module))
    if (Fits(name, prefix) && seen.insert(name).second)
      found.push_back({std::move(name), "module", {}, {}, Certainty::kCertain});
}

void Workspace::Impl::AddModules(ModuleId package, Text prefix, std::vector<Completion>& found) {
  for (std::string& name : modules.ChildNames(package))
    if (Fits(name, prefix)) found.push_back({std::move(name), "module", {}, {}, Certainty::kCertain});
}

void Workspace::Impl::AddNames(const SourceFile& file, uint32_t offset, Text prefix, std::vector<Completion>& found) {
  std::unordered_set<std::string> seen;
  for (const Completion& completion : found) seen.insert(completion.name);
  const Bindings& bindings = file.bindings;
  const uint32_t innermost = file.ScopeAt(offset);
  const uint32_t begin_of_name = offset - static_cast<uint32_t>(prefix.size());
  for (uint32_t scope = innermost; scope != kNoIndex; scope = bindings.scopes[scope].parent) {
    // The names of a class are not those of its methods.
    if (scope != innermost && bindings.scopes[scope].kind == NameScopeKind::kClass) continue;
    for (uint32_t symbol = bindings.scopes[scope].first_symbol; symbol != kNoIndex;
         symbol = bindings.symbols[symbol].next) {
      if (bindings.symbols[symbol].variable != symbol) continue;
      const Text name = bindings.texts[bindings.symbols[symbol].name];
      if (!Fits(name, prefix)) continue;
      const bool binds = std::ranges::any_of(file.occurrences().Of(symbol), [&](uint32_t i) {
        return bindings.occurrences[i].kind != NameKind::kNone && bindings.occurrences[i].begin != begin_of_name;
      });
      if (!binds || !seen.insert(std::string(name)).second) continue;
      found.push_back({std::string(name), KindOfSymbol(file, symbol, false), {}, {}, Certainty::kCertain});
    }
  }
  for (const StmtId stmt : {kModuleStmt}) {
    (void)stmt;
    for (StmtId id = 1; id < file.syntax.stmts.size(); ++id) {
      const auto exprs = file.syntax.ExprsOf(file.syntax.stmt(id));
      if (file.syntax.stmt(id).kind != StmtKind::kFromImport || exprs.size() < 2 ||
          (file.syntax[exprs[1]].flags & kIsStar) == 0)
        continue;
      std::string dotted;
      for (const ExprId part : file.syntax.ChildrenOf(exprs[0])) {
        if (!dotted.empty()) dotted += '.';
        dotted += file.syntax.NameOf(part);
      }
      const ModuleId other = modules.FindFrom(file.id, file.syntax[exprs[0]].op, dotted);
      if (other != kNoModule) AddModuleNames(other, prefix, found, false);
    }
  }
  const ModuleId builtins = modules.Find("builtins");
  if (builtins != kNoModule) AddModuleNames(builtins, prefix, found, !prefix.empty());
}

void Workspace::Impl::AddKeywords(const SourceFile& file, uint32_t offset, Text prefix,
                                  std::vector<Completion>& found) {
  // The parameters of the call in whose brackets the place lies.
  const FileSyntax& syntax = file.syntax;
  ExprId expr = syntax.ExpressionAt(offset);
  ExprId inner = kNoExpr;
  while (expr != kNoExpr && syntax[expr].kind != ExprKind::kCall) {
    inner = expr;
    expr = syntax[expr].parent;
  }
  if (expr == kNoExpr || inner == syntax.ChildOf(expr, 0) || offset <= syntax[syntax.ChildOf(expr, 0)].end) return;
  if (inner != kNoExpr && syntax[inner].kind != ExprKind::kName && syntax[inner].kind != ExprKind::kMissing) return;
  const auto add = [&](FunctionId function, bool is_bound) {
    const FunctionInfo info = inference.function(function);
    const SourceFile* source = Get(info.file);
    const auto parameters = inference.ParametersOf(info);
    for (size_t i = is_bound ? 1 : 0; i < parameters.size(); ++i) {
      if (source->syntax[parameters[i]].op != static_cast<uint8_t>(ParameterKind::kPlain)) continue;
      const Text name = source->syntax.NameOf(parameters[i]);
      if (!name.empty() && Fits(name, prefix))
        found.push_back(
            {std::string(name) + "=", "parameter", TextOfParameter(info, i, true), {}, Certainty::kCertain});
    }
  };
  const Value callee = inference.ValueOf(file.id, syntax.ChildOf(expr, 0));
  const auto add_all = [&](Value value, bool is_bound) {
    for (const TypeId id : inference.types().CopyOf(value.set))
      if (inference.types()[id].kind == TypeKind::kFunction)
        add(inference.types()[id].a, is_bound || inference.types()[id].args_count > 0);
  };
  for (const TypeId id : inference.types().CopyOf(callee.set)) {
    const Type t = inference.types()[id];
    if (t.kind == TypeKind::kFunction) add_all(inference.Just(id), false);
    if (t.kind == TypeKind::kClass) {
      const ClassInfo& info = inference.MembersOf(t.a);
      if (!info.fields.empty()) {
        for (const MadeField& field : info.fields)
          if (Fits(field.name, prefix))
            found.push_back({std::string(field.name) + "=", "parameter", {}, {}, Certainty::kCertain});
      } else {
        add_all(inference.AttributeOf(inference.Just(inference.InstanceOf(t.a)), "__init__"), true);
      }
    }
  }
}

std::vector<Completion> Workspace::Complete(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<Completion> found;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return found;
  const FileSyntax& syntax = file->syntax;
  const Text text = file->text();
  offset = std::min(offset, static_cast<uint32_t>(text.size()));
  uint32_t begin = offset;
  while (begin > 0 && IsNameByte(text[begin - 1])) --begin;
  const Text prefix = text.substr(begin, offset - begin);
  // Inside of a string or a comment that is no code nothing is said; a number's point is none of an attribute.
  const auto statement_at = [&](uint32_t at) {
    StmtId stmt = syntax.StatementAt(at);
    if (stmt == kModuleStmt && at > 0) stmt = syntax.StatementAt(at - 1);
    return stmt;
  };
  uint32_t before = begin;
  while (before > 0 && (text[before - 1] == ' ' || text[before - 1] == '\t')) --before;
  const StmtId stmt = statement_at(before > 0 ? before - 1 : 0);
  const Stmt& at = syntax.stmt(stmt);
  if (!prefix.empty() && prefix.front() >= '0' && prefix.front() <= '9') return found;
  if (stmt != kModuleStmt && (at.kind == StmtKind::kImport || at.kind == StmtKind::kFromImport) && begin >= at.begin &&
      text.substr(at.begin, begin - at.begin).find_first_of("\n;") == Text::npos) {
    const auto exprs = syntax.ExprsOf(at);
    const Text head = text.substr(at.begin, begin - at.begin);
    const size_t behind_import = at.kind == StmtKind::kFromImport ? head.find(" import") : Text::npos;
    if (at.kind == StmtKind::kFromImport && behind_import != Text::npos) {
      const ExprId path = exprs.empty() ? kNoExpr : exprs[0];
      if (path == kNoExpr) return found;
      std::string dotted;
      for (const ExprId part : syntax.ChildrenOf(path)) {
        if (!dotted.empty()) dotted += '.';
        dotted += syntax.NameOf(part);
      }
      const ModuleId module = in.modules.FindFrom(id, syntax[path].op, dotted);
      if (module != kNoModule) in.AddModuleNames(module, prefix, found, true);
    } else {
      // The dotted path up to the place.
      size_t start = head.size();
      while (start > 0 && (IsNameByte(head[start - 1]) || head[start - 1] == '.')) --start;
      Text dotted = head.substr(start);
      int level = 0;
      while (!dotted.empty() && dotted.front() == '.') {
        ++level;
        dotted.remove_prefix(1);
      }
      if (dotted.ends_with('.')) dotted.remove_suffix(1);
      const ModuleId package = dotted.empty() && level == 0 ? kNoModule : in.modules.FindFrom(id, level, dotted);
      if (package != kNoModule || (dotted.empty() && level == 0)) in.AddModules(package, prefix, found);
    }
  } else if (before > 0 && text[before - 1] == '.') {
    // An attribute: its receiver ends where the dot stands.
    ExprId attribute = syntax.NamedAt(begin);
    if (attribute == kNoExpr || syntax[attribute].kind != ExprKind::kAttribute) {
      attribute = syntax.ExpressionAt(before - 1);
      while (attribute != kNoExpr && (syntax[attribute].kind != ExprKind::kAttribute || syntax[attribute].end < before))
        attribute = syntax[attribute].parent;
    }
    if (attribute == kNoExpr) {
      for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr)
        if (syntax[expr].kind == ExprKind::kAttribute && syntax[expr].begin < begin &&
            (syntax[expr].name_begin == begin || syntax[expr].end == before))
          attribute = expr;
    }
    if (attribute == kNoExpr) return found;
    const Value receiver = in.inference.ValueOf(id, syntax.ChildOf(attribute, 0));
    in.AddMembers(receiver, prefix, found);
    if (found.empty() && !receiver.IsKnown()) {
      // The names that are used of the same receiver elsewhere in the file.
      const Text written = syntax.TextOf(syntax[syntax.ChildOf(attribute, 0)]);
      std::unordered_set<std::string> seen;
      for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
        if (expr == attribute || syntax[expr].kind != ExprKind::kAttribute) continue;
        const Text name = syntax.NameOf(expr);
        if (name.empty() || !Fits(name, prefix) || syntax.TextOf(syntax[syntax.ChildOf(expr, 0)]) != written) continue;
        if (seen.insert(std::string(name)).second)
          found.push_back({std::string(name), "attribute", {}, {}, Certainty::kByName});
      }
    }
  } else {
    const ExprId expr = syntax.ExpressionAt(offset);
    if (expr != kNoExpr && syntax[expr].kind == ExprKind::kString && (syntax[expr].flags & kHoldsHint) == 0 &&
        offset > syntax[expr].begin && (syntax[expr].op & (kStringFormatted | kStringTemplate)) == 0 &&
        offset < syntax[expr].end)
      return found;
    in.AddKeywords(*file, offset, prefix, found);
    in.AddNames(*file, offset, prefix, found);
    for (const Text keyword : kKeywords)
      if (Fits(keyword, prefix)) found.push_back({std::string(keyword), "keyword", {}, {}, Certainty::kCertain});
  }
  // What begins exactly so first; private names last; otherwise in the order in which they were found, the nearest
  // first.
  std::ranges::stable_sort(found, [&](const Completion& a, const Completion& b) {
    const auto rank = [&](const Completion& completion) {
      int rank_of = completion.name.starts_with("__") ? 4 : completion.name.starts_with('_') ? 2 : 0;
      if (!completion.name.starts_with(prefix)) rank_of += 1;
      return rank_of;
    };
    return std::pair(a.certainty, rank(a)) < std::pair(b.certainty, rank(b));
  });
  return found;
}

}  // namespace quillet
