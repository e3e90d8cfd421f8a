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

bool EndsWithWord(Text text, Text word) {
  while (!text.empty() && (text.back() == ' ' || text.back() == '\t')) text.remove_suffix(1);
  return text.ends_with(word) && text.size() > word.size() && !IsNameByte(text[text.size() - word.size() - 1]);
}

// The word `import` in the head of a `from`, as a word of its own behind the module.
size_t FindImport(Text head) {
  for (size_t at = head.find("import"); at != Text::npos; at = head.find("import", at + 1)) {
    const bool begins = at > 0 && (head[at - 1] == ' ' || head[at - 1] == '\t' || head[at - 1] == '.');
    const bool ends = at + 6 >= head.size() || !IsNameByte(head[at + 6]);
    if (begins && ends && (at + 6 == head.size() || head[at + 6] != '.')) return at;
  }
  return Text::npos;
}

// The attribute whose name begins at `begin`, behind a dot that ends at `before`.
ExprId AttributeBehindDot(const FileSyntax& syntax, uint32_t begin, uint32_t before) {
  ExprId attribute = syntax.NamedAt(begin);
  if (attribute != kNoExpr && syntax[attribute].kind == ExprKind::kAttribute) return attribute;
  attribute = syntax.ExpressionAt(before - 1);
  while (attribute != kNoExpr && (syntax[attribute].kind != ExprKind::kAttribute || syntax[attribute].end < before))
    attribute = syntax[attribute].parent;
  if (attribute != kNoExpr) return attribute;
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr)
    if (syntax[expr].kind == ExprKind::kAttribute && syntax[expr].begin < begin &&
        (syntax[expr].name_begin == begin || syntax[expr].end == before))
      attribute = expr;
  return attribute;
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
      {
        std::vector<std::pair<uint32_t, Text>> written;
        for (const auto& [name, offsets] : info.self_attributes)
          if (!on_class || info.class_written.contains(name)) written.emplace_back(offsets.front(), name);
        std::ranges::sort(written);
        for (const auto& [offset, name] : written) add(name, "attribute", info.name);
      }
      if (info.call != kNoExpr)
        for (const MadeField& field : info.fields) add(field.name, "attribute", info.name);
    }
  };
  for (const TypeId id : InOrder(receiver.set)) {
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
        if (!occurrence.binds()) continue;
        if (!inference.IsReachable(*file, file->syntax.StatementAt(occurrence.begin))) continue;
        binds = true;
        if (occurrence.kind == NameKind::kImport) is_import = true;
        if (occurrence.kind == NameKind::kImport && occurrence.role == NameRole::kDefinition) is_re_export = true;
        if (occurrence.kind != NameKind::kImport) is_re_export = true;
      }
      if (!binds || (is_import && !is_re_export) || (at != module && name.starts_with('_'))) continue;
      if (!with_private && name.starts_with('_') && (prefix.empty() || prefix == "_")) continue;
      seen.insert(std::string(name));
      found.push_back(
          {std::string(name), KindOfSymbol(*file, symbol, false), modules[at].name, {}, Certainty::kCertain});
    }
    for (StmtId stmt = 1; stmt < file->syntax.stmts.size(); ++stmt) {
      const auto exprs = file->syntax.ExprsOf(file->syntax.stmt(stmt));
      if (file->syntax.stmt(stmt).kind != StmtKind::kFromImport || exprs.size() < 2 ||
          (file->syntax[exprs[1]].flags & kIsStar) == 0)
        continue;
      const ModuleId other = modules.FindFrom(id, file->syntax[exprs[0]].op, file->syntax.DottedNameOf(exprs[0]));
      if (other != kNoModule) pending.push_back(other);
    }
  }
  const Module& own = modules[module];
  if (own.stub != kNoFile && own.file != kNoFile && IsProject(own.file))
    AddNamesOfFile(own.file, own.name, prefix, found, seen);
  if (with_private) {
    for (const Text name : {Text("__doc__"), Text("__file__"), Text("__name__"), Text("__package__")})
      if (Fits(name, prefix) && seen.insert(std::string(name)).second)
        found.push_back({std::string(name), "variable", own.name, {}, Certainty::kCertain});
  }
  for (std::string& name : modules.ChildNames(module))
    if (Fits(name, prefix) && seen.insert(name).second)
      found.push_back({std::move(name), "module", {}, {}, Certainty::kCertain});
}

void Workspace::Impl::AddNamesOfFile(FileId id, Text module, Text prefix, std::vector<Completion>& found,
                                     std::unordered_set<std::string>& seen) {
  const SourceFile* file = Get(id);
  if (file == nullptr) return;
  const Bindings& bindings = file->bindings;
  for (uint32_t symbol = bindings.scopes[0].first_symbol; symbol != kNoIndex; symbol = bindings.symbols[symbol].next) {
    const Text name = bindings.texts[bindings.symbols[symbol].name];
    if (!Fits(name, prefix) || !Bindings::IsBound(bindings.symbols[symbol])) continue;
    if (seen.insert(std::string(name)).second)
      found.push_back(
          {std::string(name), KindOfSymbol(*file, symbol, false), std::string(module), {}, Certainty::kCertain});
  }
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
        return bindings.occurrences[i].binds() && bindings.occurrences[i].begin != begin_of_name;
      });
      if (!binds || !seen.insert(std::string(name)).second) continue;
      found.push_back({std::string(name), KindOfSymbol(file, symbol, false), {}, {}, Certainty::kCertain});
    }
  }
  {
    for (StmtId id = 1; id < file.syntax.stmts.size(); ++id) {
      const auto exprs = file.syntax.ExprsOf(file.syntax.stmt(id));
      if (file.syntax.stmt(id).kind != StmtKind::kFromImport || exprs.size() < 2 ||
          (file.syntax[exprs[1]].flags & kIsStar) == 0)
        continue;
      const ModuleId other = modules.FindFrom(file.id, file.syntax[exprs[0]].op, file.syntax.DottedNameOf(exprs[0]));
      if (other != kNoModule) AddModuleNames(other, prefix, found, false);
    }
  }
  for (const Text name : {Text("__doc__"), Text("__file__"), Text("__name__"), Text("__package__")})
    if (prefix.starts_with("__") && Fits(name, prefix) && seen.insert(std::string(name)).second)
      found.push_back({std::string(name), "variable", {}, {}, Certainty::kCertain});
  const ModuleId builtins = modules.Find("builtins");
  if (builtins == kNoModule) return;
  const auto own = static_cast<ptrdiff_t>(found.size());
  AddModuleNames(builtins, prefix, found, false);
  found.erase(std::remove_if(found.begin() + own, found.end(),
                             [](const Completion& name) { return Inference::IsOfBuiltinsStub(name.name); }),
              found.end());
}

// Whether a name that is being typed is one that the place itself gives.
Workspace::Impl::NewName Workspace::Impl::NewNameAt(const SourceFile& file, uint32_t begin) {
  const FileSyntax& syntax = file.syntax;
  Text head = file.text().substr(0, begin);
  head = head.substr(head.find_last_of("\n\r") + 1);
  if (EndsWithWord(" " + std::string(head), "def")) {
    return file.bindings.scopes[file.ScopeAt(begin)].kind == NameScopeKind::kClass ? NewName::kMethod : NewName::kOther;
  }
  if (EndsWithWord(" " + std::string(head), "class") || EndsWithWord(" " + std::string(head), "as"))
    return NewName::kOther;
  const ExprId named = syntax.NamedAt(begin);
  if (named != kNoExpr && syntax[named].kind == ExprKind::kParameter) return NewName::kOther;
  return NewName::kNone;
}

bool Workspace::Impl::IsInBrackets(const SourceFile& file, uint32_t offset) {
  int depth = 0;
  const Text text = file.text();
  const StmtId stmt = file.syntax.StatementAt(offset > 0 ? offset - 1 : 0);
  for (uint32_t at = file.syntax.stmt(stmt).begin; at < offset && at < text.size(); ++at) {
    if (text[at] == '(' || text[at] == '[' || text[at] == '{') ++depth;
    if (text[at] == ')' || text[at] == ']' || text[at] == '}') --depth;
  }
  return stmt != kModuleStmt && depth > 0;
}

bool Workspace::Impl::AddKeywords(const SourceFile& file, uint32_t offset, Text prefix,
                                  std::vector<Completion>& found) {
  // The parameters of the call in whose brackets the place lies, without those that are given.
  const FileSyntax& syntax = file.syntax;
  const auto begin = offset - static_cast<uint32_t>(prefix.size());
  ExprId expr = syntax.ExpressionAt(offset);
  while (expr != kNoExpr && (syntax[expr].kind != ExprKind::kCall || begin <= syntax[syntax.ChildOf(expr, 0)].end))
    expr = syntax[expr].parent;
  if (expr == kNoExpr) return false;
  size_t positions = 0;
  bool has_star = false;
  std::unordered_set<Text> given;
  for (const ExprId argument : syntax.ChildrenOf(expr).subspan(1)) {
    const Expr& at = syntax[argument];
    if (at.begin <= begin && begin <= at.end) {
      // In the value of a keyword, or inside of an expression, none can begin.
      if (at.begin != begin) return false;
      continue;
    }
    if (at.kind == ExprKind::kKeyword && at.end < begin) {
      given.insert(syntax.NameOf(argument));
    } else if (at.kind != ExprKind::kMissing && at.end < begin) {
      ++positions;
      has_star = has_star || at.kind == ExprKind::kStarred;
    }
  }
  bool is_full = true, is_any = false;
  const Value callee = inference.ValueOf(file.id, syntax.ChildOf(expr, 0));
  const auto add = [&](FunctionId function, bool is_bound) {
    const FunctionInfo info = inference.function(function);
    const SourceFile* source = Get(info.file);
    const auto parameters = inference.ParametersOf(info);
    bool is_keyword_only = false;
    size_t position = 0, first_keyword = 0;
    for (size_t i = 0; i < parameters.size(); ++i)
      if (source->syntax[parameters[i]].op == static_cast<uint8_t>(ParameterKind::kSlash)) first_keyword = i;
    bool takes_more = has_star && given.empty();
    for (size_t i = is_bound ? 1 : 0; i < parameters.size(); ++i) {
      const auto kind = static_cast<ParameterKind>(source->syntax[parameters[i]].op);
      if (kind == ParameterKind::kStar || kind == ParameterKind::kBareStar) is_keyword_only = true;
      if (kind == ParameterKind::kStar && given.empty()) takes_more = true;
      if (kind != ParameterKind::kPlain) continue;
      const Text name = source->syntax.NameOf(parameters[i]);
      if (!is_keyword_only && position++ < positions) continue;
      if (!is_keyword_only && given.empty()) takes_more = true;
      if (given.contains(name) || i < first_keyword) continue;
      if (!name.empty() && Fits(name, prefix))
        found.push_back(
            {std::string(name) + "=", "parameter", TextOfParameter(info, i, true), {}, CertaintyOf(callee.doubt)});
    }
    is_full = is_full && !takes_more;
    is_any = true;
  };
  const auto add_all = [&](Value value, bool is_bound) {
    for (const TypeId id : InOrder(value.set))
      if (inference.types()[id].kind == TypeKind::kFunction)
        add(inference.types()[id].a, is_bound || inference.types()[id].args_count > 0);
  };
  for (const TypeId id : InOrder(callee.set)) {
    const Type t = inference.types()[id];
    if (t.kind == TypeKind::kFunction) add_all(inference.Just(id), false);
    if (t.kind == TypeKind::kInstance) add_all(inference.AttributeOf(inference.Just(id), "__call__"), true);
    if (t.kind == TypeKind::kClass) {
      const ClassInfo& info = inference.MembersOf(t.a);
      if (!info.fields.empty()) {
        for (const MadeField& field : info.fields)
          if (Fits(field.name, prefix))
            found.push_back({std::string(field.name) + "=", "parameter", {}, {}, CertaintyOf(callee.doubt)});
      } else {
        add_all(inference.AttributeOf(inference.Just(inference.InstanceOf(t.a)), "__init__"), true);
      }
    }
  }
  return is_any && is_full;
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
    const size_t behind_import = at.kind == StmtKind::kFromImport ? FindImport(head) : Text::npos;
    if (EndsWithWord(head, "as")) return found;  // a name of one's own
    const size_t last = head.find_last_not_of(" \t");
    const bool is_behind_path = at.kind == StmtKind::kFromImport && behind_import == Text::npos && last != Text::npos &&
                                last + 1 < head.size() && IsNameByte(head[last]) &&
                                !EndsWithWord(" " + std::string(head), "from");
    if (is_behind_path) {
      if (Text("import").starts_with(prefix)) found.push_back({"import", "keyword", {}, {}, Certainty::kCertain});
      return found;
    }
    if (at.kind == StmtKind::kFromImport && behind_import != Text::npos) {
      const ExprId path = exprs.empty() ? kNoExpr : exprs[0];
      if (path == kNoExpr) return found;
      const ModuleId module = in.modules.FindFrom(id, syntax[path].op, syntax.DottedNameOf(path));
      if (module != kNoModule) in.AddModuleNames(module, prefix, found, true);
    } else {
      // The dotted path up to the place.
      size_t start = head.size();
      while (start > 0 && head[start - 1] == ' ' && last != Text::npos && head[last] == '.') --start;
      const size_t path_end = start;
      while (start > 0 && (IsNameByte(head[start - 1]) || head[start - 1] == '.')) --start;
      Text dotted = head.substr(start, path_end - start);
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
    const ExprId attribute = AttributeBehindDot(syntax, begin, before);
    if (attribute == kNoExpr) return found;
    const Value receiver = in.inference.ValueOf(id, syntax.ChildOf(attribute, 0));
    in.AddMembers(receiver, prefix, found);
    if (found.empty() && !in.inference.WithoutForeign(receiver).IsKnown()) {
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
    switch (in.NewNameAt(*file, begin)) {
      case Impl::NewName::kMethod: {  // one that a base has
        const ClassId cls = in.inference.ClassOfScope(*file, file->ScopeAt(begin));
        if (cls == kNoId) return found;
        std::vector<Completion> members;
        const std::vector<BaseClass> bases = in.inference.InfoOf(cls).bases;
        for (const BaseClass& base : bases)
          in.AddMembers(in.inference.Just(in.inference.InstanceOf(base.cls)), prefix, members);
        for (Completion& member : members)
          if (member.kind == "method" || member.kind == "property") found.push_back(std::move(member));
        return found;
      }
      case Impl::NewName::kOther:
        return found;
      case Impl::NewName::kNone:
        break;
    }
    if (const ExprId value = syntax.ExpressionAt(before); prefix.empty() && before < offset && value != kNoExpr &&
                                                          syntax[value].kind == ExprKind::kNumber &&
                                                          syntax[value].end == before) {
      for (const Text keyword : {Text("and"), Text("if"), Text("in"), Text("is"), Text("not"), Text("or")})
        found.push_back({std::string(keyword), "keyword", {}, {}, Certainty::kCertain});
      return found;
    }
    const bool is_inside = in.IsInBrackets(*file, begin);
    if (in.AddKeywords(*file, offset, prefix, found)) return found;
    in.AddNames(*file, offset, prefix, found);
    for (const Text keyword : kKeywords)
      if (Fits(keyword, prefix) && !(is_inside && OnlyBeginsStatement(CodeOfText(keyword))))
        found.push_back({std::string(keyword), "keyword", {}, {}, Certainty::kCertain});
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

Hover Workspace::DescribeCompletion(FileId id, uint32_t offset, Text name) {
  Impl& in = *impl_;
  in.Begin();
  Hover hover;
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return hover;
  const FileSyntax& syntax = file->syntax;
  const Text text = file->text();
  uint32_t begin = std::min(offset, static_cast<uint32_t>(text.size()));
  while (begin > 0 && IsNameByte(text[begin - 1])) --begin;
  uint32_t before = begin;
  while (before > 0 && (text[before - 1] == ' ' || text[before - 1] == '\t')) --before;
  hover.begin = begin;
  hover.end = offset;
  Value value = kUnknownValue;
  const auto take = [&](const Entities& entities) {
    value = {kNoTypes, entities.doubt};
    for (const Entity& entity : entities.found)
      value = in.inference.types().Union(value, in.inference.ValueOfEntity(entity));
  };
  const StmtId stmt = syntax.StatementAt(before > 0 ? before - 1 : 0);
  const ExprId attribute = before > 0 && text[before - 1] == '.' ? AttributeBehindDot(syntax, begin, before) : kNoExpr;
  if (attribute != kNoExpr) {
    value = in.inference.AttributeOf(in.inference.ValueOf(id, syntax.ChildOf(attribute, 0)), name);
  } else if (stmt != kModuleStmt && syntax.stmt(stmt).kind == StmtKind::kFromImport &&
             !syntax.ExprsOf(syntax.stmt(stmt)).empty()) {
    const ExprId path = syntax.ExprsOf(syntax.stmt(stmt))[0];
    const ModuleId module = in.modules.FindFrom(id, syntax[path].op, syntax.DottedNameOf(path));
    if (module != kNoModule) take(in.inference.EntitiesInModule(module, name));
  } else {
    const Bindings& bindings = file->bindings;
    uint32_t variable = kNoIndex;
    const uint32_t own = file->ScopeAt(begin);
    for (uint32_t scope = own; scope != kNoIndex && variable == kNoIndex; scope = bindings.scopes[scope].parent) {
      if (scope != own && bindings.scopes[scope].kind == NameScopeKind::kClass) continue;
      for (uint32_t symbol = bindings.scopes[scope].first_symbol; symbol != kNoIndex && variable == kNoIndex;
           symbol = bindings.symbols[symbol].next)
        if (bindings.texts[bindings.symbols[symbol].name] == name && Bindings::IsBound(bindings.symbols[symbol]))
          variable = bindings.symbols[symbol].variable;
    }
    const ModuleId builtins = in.modules.Find("builtins");
    if (variable != kNoIndex) {
      take({{in.inference.EntityOfVariable(*file, variable)}, 0});
    } else if (builtins != kNoModule) {
      take(in.inference.EntitiesInModule(builtins, name));
    }
  }
  if (value.IsKnown()) in.Describe(value, name, hover);
  return hover;
}

}  // namespace quillet
