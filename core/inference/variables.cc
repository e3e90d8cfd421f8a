// What a name was given: bindings, imports, targets.
#include <algorithm>
#include <array>
#include <memory>
#include <tuple>

#include "inference/flow.h"
#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

namespace {

bool Binds(const Occurrence& occurrence) { return occurrence.kind != NameKind::kNone; }

// A module's path, as far as paths of modules go.
constexpr size_t kMaxPathParts = 64;
std::string PathOf(const FileSyntax& syntax, ExprId path, size_t parts = SIZE_MAX) {
  return syntax.DottedNameOf(path, std::min(parts, kMaxPathParts + 1));
}

// Scopes whose code runs where it stands.
bool RunsInPlace(NameScopeKind kind) {
  return kind == NameScopeKind::kComprehension || kind == NameScopeKind::kClass ||
         kind == NameScopeKind::kTypeParameters || kind == NameScopeKind::kAnnotation;
}

// What Python 2 has and 3 has not, by what is nearest to it.
Text NewNameOfBuiltin(Text name) {
  static constexpr std::array<std::pair<Text, Text>, 8> kNames{{{"unicode", "str"},
                                                                {"basestring", "str"},
                                                                {"long", "int"},
                                                                {"xrange", "range"},
                                                                {"raw_input", "input"},
                                                                {"unichr", "chr"},
                                                                {"file", "open"},
                                                                {"StandardError", "Exception"}}};
  for (const auto& [old_name, new_name] : kNames)
    if (old_name == name) return new_name;
  return kNoText;
}

}  // namespace

// ---- which bindings ----

bool Inference::IsReachable(const SourceFile& file, StmtId id) {
  enum ClauseReach : uint8_t { kIsReachable = 1, kEndsChain = 2 };  // nothing of its chain behind it runs
  const FileSyntax& syntax = file.syntax;
  const auto key = [&](StmtId stmt) { return (uint64_t{file.id} << 32 | stmt) + 1; };
  const auto is_clause = [](StmtKind kind) {
    return kind == StmtKind::kIf || kind == StmtKind::kElif || kind == StmtKind::kElse;
  };
  std::vector<StmtId> chain;
  for (; id != kModuleStmt; id = syntax.stmt(id).parent) {
    if (!is_clause(syntax.stmt(id).kind)) continue;
    const uint8_t* known = reachable_clauses_.Find(key(id));
    if (known == nullptr) {
      // Those in front of it of which nothing is known yet, and then each from the one in front.
      chain.assign(1, id);
      uint8_t before = 0;
      for (StmtId at = id; syntax.stmt(at).kind != StmtKind::kIf;) {
        at = syntax.stmt(at).previous;
        if (at == kModuleStmt || (syntax.stmt(at).kind != StmtKind::kIf && syntax.stmt(at).kind != StmtKind::kElif))
          break;
        known = reachable_clauses_.Find(key(at));
        if (known != nullptr) {
          before = *known;
          break;
        }
        chain.push_back(at);
      }
      CountSteps(static_cast<int64_t>(chain.size()));
      for (size_t i = chain.size(); i-- > 0;) {
        const auto exprs = syntax.ExprsOf(syntax.stmt(chain[i]));
        const bool has_condition = syntax.stmt(chain[i]).kind != StmtKind::kElse && !exprs.empty();
        const int truth = has_condition ? StaticTruth(file, exprs[0]) : -1;
        const bool is_behind_end = (before & kEndsChain) != 0;
        before = static_cast<uint8_t>((truth != 0 && !is_behind_end ? kIsReachable : 0) |
                                      (truth == 1 || is_behind_end ? kEndsChain : 0));
        reachable_clauses_.Put(key(chain[i]), before);
      }
      if ((before & kIsReachable) == 0) return false;
      continue;
    }
    if ((*known & kIsReachable) == 0) return false;
  }
  return true;
}

const std::vector<Binding>& Inference::BindingsReaching(const SourceFile& file, uint32_t index, bool* may_be_unbound) {
  const Reaching& found = reaching_.Get(file.id, index, [&] { return FindBindingsReaching(file, index); });
  if (may_be_unbound != nullptr) *may_be_unbound = found.may_be_unbound;
  return found.bindings;
}

const Inference::OwnBindings& Inference::BindingsOfVariable(const SourceFile& file, uint32_t variable) {
  return own_bindings_.Get(file.id, variable, [&] { return FindBindingsOfVariable(file, variable); });
}

Inference::OwnBindings Inference::FindBindingsOfVariable(const SourceFile& file, uint32_t variable) {
  const NameSymbol& owner = file.bindings.symbols[variable];
  OwnBindings found;
  const auto indices = file.occurrences().Of(variable);
  CountSteps(static_cast<int64_t>(indices.size()));
  for (const uint32_t i : indices) {
    const Occurrence& other = file.bindings.occurrences[i];
    if (!Binds(other)) continue;
    if (!IsReachable(file, file.syntax.StatementAt(other.begin))) {
      found.unreachable.push_back(other.begin);
      continue;
    }
    uint32_t at = file.bindings.ScopeOf(other);
    while (at != owner.scope && at != kNoIndex && file.bindings.scopes[at].kind == NameScopeKind::kComprehension)
      at = file.bindings.scopes[at].parent;
    if (other.kind == NameKind::kParameter) {
      found.parameters.push_back(other.begin);
    } else {
      (at == owner.scope ? found.own : found.elsewhere).push_back(other.begin);
    }
  }
  DropImportsOfItself(file, found.own);
  return found;
}

Inference::Reaching Inference::FindBindingsReaching(const SourceFile& file, uint32_t index) {
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const uint32_t variable = file.bindings.VariableOf(occurrence);
  if (variable == kNoIndex) return {};
  const NameSymbol& owner = file.bindings.symbols[variable];
  const NameScope& scope = file.bindings.scopes[owner.scope];
  const OwnBindings& all = BindingsOfVariable(file, variable);
  const std::vector<uint32_t>&own = all.own, &elsewhere = all.elsewhere, &parameters = all.parameters;
  std::vector<uint32_t> reached;
  bool is_bound = false;
  if (scope.kind != NameScopeKind::kModule && scope.kind != NameScopeKind::kFunction &&
      scope.kind != NameScopeKind::kClass) {
    reached = own;
    reached.insert(reached.end(), parameters.begin(), parameters.end());
    is_bound = true;
  } else if (!own.empty()) {
    const StmtId top = file.StmtOfScope(owner.scope);
    bool is_deferred = file.is_stub;
    for (uint32_t at = file.bindings.ScopeOf(occurrence); at != owner.scope && at != kNoIndex;
         at = file.bindings.scopes[at].parent)
      if (!RunsInPlace(file.bindings.scopes[at].kind)) is_deferred = true;
    const std::function<int(ExprId)> truth = [&](ExprId condition) { return StaticTruth(file, condition); };
    Flow flow(file, own, truth);
    is_bound = is_deferred ? flow.ReachEnd(top, reached) : flow.Reach(occurrence.begin, top, reached);
    if (is_deferred && !is_bound) is_bound = !reached.empty();
    if (is_deferred || (reached.empty() && parameters.empty()))
      reached.insert(reached.end(), elsewhere.begin(), elsewhere.end());
    // A name that is used in front of its binding: by a hint, by a decorator in a loop, by mistake.
    if (reached.empty() && parameters.empty()) flow.ReachEnd(top, reached);
    CountLooks(flow.looks());
  } else {
    reached = elsewhere;
  }
  if (!is_bound) reached.insert(reached.end(), parameters.begin(), parameters.end());
  if (reached.empty()) reached = own.empty() ? all.unreachable : own;
  if (reached.size() > Flow::kMaxBindings) reached.resize(Flow::kMaxBindings);
  std::ranges::sort(reached);
  Reaching found;
  found.may_be_unbound = !is_bound && parameters.empty();
  found.bindings.reserve(reached.size());
  for (const uint32_t offset : reached) found.bindings.push_back({file.id, offset});
  return found;
}

Entity Inference::EntityOfVariable(const SourceFile& file, uint32_t symbol) {
  const uint32_t variable = file.bindings.symbols[symbol].variable;
  const NameSymbol& owner = file.bindings.symbols[variable];
  const ClassId cls = ClassOfScope(file, owner.scope);
  if (cls != kNoId) {
    // As it is spelled: a private name is mangled in its scope.
    Text name = file.bindings.texts[owner.name];
    const auto occurrences = file.occurrences().Of(variable);
    if (!occurrences.empty()) name = file.bindings.TextOf(file.bindings.occurrences[occurrences.front()]);
    return {Entity::kMember, cls, NumberOfName(name)};
  }
  return {Entity::kVariable, file.id, variable};
}

const Inference::ModuleNames& Inference::NamesOfModule(const SourceFile& file) {
  const auto [at, is_new] = module_names_.try_emplace(file.id);
  ModuleNames& names = at->second;
  if (!is_new) return names;
  const Afresh afresh(*this, kMaxDepth / 4);
  const Bindings& bindings = file.bindings;
  for (uint32_t symbol = bindings.scopes[0].first_symbol; symbol != kNoIndex; symbol = bindings.symbols[symbol].next) {
    const auto indices = file.occurrences().Of(symbol);
    if (std::ranges::any_of(indices, [&](uint32_t i) { return Binds(bindings.occurrences[i]); }))
      names.symbols.emplace(Kept(bindings.texts[bindings.symbols[symbol].name]), symbol);
  }
  const FileSyntax& syntax = file.syntax;
  const std::function<void(ExprId)> add_all = [&](ExprId list) {
    names.has_all = true;
    if (syntax[list].kind == ExprKind::kBinary) {
      add_all(syntax.ChildOf(list, 0));
      add_all(syntax.ChildOf(list, 1));
      return;
    }
    if (syntax[list].kind == ExprKind::kAttribute && syntax.NameOf(list) == "__all__") {
      for (const TypeId id : types_.CopyOf(ValueOf(file.id, syntax.ChildOf(list, 0)).set)) {
        const FileId other = types_[id].kind == TypeKind::kModule ? FileOfModule(types_[id].a) : kNoFile;
        const SourceFile* source = other == kNoFile || other == file.id ? nullptr : FileOf(other);
        if (source == nullptr) continue;
        const std::vector<Text> all = NamesOfModule(*source).all;
        std::vector<Text>& own = module_names_[file.id].all;
        own.insert(own.end(), all.begin(), all.end());
      }
      return;
    }
    for (const ExprId item : syntax.ChildrenOf(list)) {
      if (syntax[item].kind != ExprKind::kString) continue;
      Text text = syntax.TextOf(syntax[item]);
      while (!text.empty() && text.front() != '\'' && text.front() != '"') text.remove_prefix(1);
      if (text.size() >= 2) names.all.push_back(Kept(text.substr(1, text.size() - 2)));
    }
  };
  for (StmtId id = 1; id < syntax.stmts.size(); ++id) {
    const Stmt& stmt = syntax.stmt(id);
    const auto exprs = syntax.ExprsOf(stmt);
    if (stmt.kind == StmtKind::kFromImport) {
      if (exprs.size() > 1 && (syntax[exprs[1]].flags & kIsStar) != 0) names.stars.push_back(id);
    } else if ((stmt.kind == StmtKind::kAssign || stmt.kind == StmtKind::kAugmentedAssign ||
                stmt.kind == StmtKind::kAnnotated) &&
               exprs.size() == 2 && syntax.NameOf(exprs[0]) == "__all__") {
      add_all(exprs[1]);
    } else if (stmt.kind == StmtKind::kExpression && exprs.size() == 1 && syntax[exprs[0]].kind == ExprKind::kCall) {
      const ExprId callee = syntax.ChildOf(exprs[0], 0), argument = syntax.ChildOf(exprs[0], 1);
      const bool is_extend = syntax[callee].kind == ExprKind::kAttribute && argument != kNoExpr &&
                             syntax.NameOf(syntax.ChildOf(callee, 0)) == "__all__";
      if (is_extend && syntax.NameOf(callee) == "extend") add_all(argument);
    }
  }
  return names;
}

Entities Inference::EntitiesInModule(ModuleId module, Text name, int depth) {
  Entities found = EntitiesInFile(module, FileOfModule(module), name, depth);
  if (!found.found.empty()) return found;
  // What a stub leaves out its source may have.
  const Module& own = modules_[module];
  if (own.stub != kNoFile && own.file != kNoFile) found = EntitiesInFile(module, own.file, name, depth);
  if (!found.found.empty()) return found;
  const ModuleId child = modules_.Child(module, name);
  if (child != kNoModule) found.found.push_back({Entity::kModule, child, 0});
  return found;
}

Entities Inference::EntitiesInFile(ModuleId module, FileId file_id, Text name, int depth) {
  Entities found;
  static constexpr int kMaxImports = 24;
  if (depth > kMaxImports) return found;
  const SourceFile* file = file_id == kNoFile ? nullptr : FileOf(file_id);
  if (file != nullptr) {
    const ModuleNames& names = NamesOfModule(*file);
    if (const auto at = names.symbols.find(name); at != names.symbols.end()) {
      bool has_own = false;
      for (const uint32_t i : file->occurrences().Of(at->second)) {
        const Occurrence& occurrence = file->bindings.occurrences[i];
        if (!Binds(occurrence)) continue;
        if (occurrence.kind != NameKind::kImport) {
          has_own = true;
          continue;
        }
        if (!IsReachable(*file, file->syntax.StatementAt(occurrence.begin))) continue;
        const Entities imported = EntitiesOfImport(*file, occurrence.begin, depth + 1);
        if (imported.found.empty()) has_own = true;
        for (const Entity& entity : imported.found)
          if (std::ranges::find(found.found, entity) == found.found.end()) found.found.push_back(entity);
      }
      if (has_own) found.found.push_back(EntityOfVariable(*file, at->second));
      return found;
    }
    for (const StmtId star : names.stars) {
      if (!IsReachable(*file, star)) continue;
      const ExprId path = file->syntax.ExprsOf(file->syntax.stmt(star))[0];
      const ModuleId source = modules_.FindFrom(file_id, file->syntax[path].op, PathOf(file->syntax, path));
      if (source == kNoModule) {
        found.doubt |= Value::kOpen;
        continue;
      }
      if (source == module) continue;
      const FileId source_file = FileOfModule(source);
      const SourceFile* other = source_file == kNoFile ? nullptr : FileOf(source_file);
      if (other == nullptr) continue;
      const ModuleNames& others = NamesOfModule(*other);
      const bool is_listed = std::ranges::find(others.all, name) != others.all.end();
      if (others.has_all ? !is_listed : name.starts_with('_')) continue;
      Entities starred = EntitiesInModule(source, name, depth + 1);
      if (!starred.found.empty()) found.found = std::move(starred.found);
    }
  }
  return found;
}

Entities Inference::EntitiesOfImport(const SourceFile& file, uint32_t offset, int depth) {
  const FileSyntax& syntax = file.syntax;
  Entities found;
  const ExprId named = syntax.NamedAt(offset);
  if (named == kNoExpr) return found;
  const ExprId parent = syntax[named].parent;
  const StmtId stmt = syntax.StatementOf(named);
  if (stmt == kModuleStmt) return found;
  const auto exprs = syntax.ExprsOf(syntax.stmt(stmt));
  const auto add_module = [&](ExprId path, size_t parts) {
    const ModuleId module = modules_.FindFrom(file.id, syntax[path].op, PathOf(syntax, path, parts));
    if (module != kNoModule) found.found.push_back({Entity::kModule, module, 0});
  };
  const auto whole = [&](ExprId path) { return syntax.ChildrenOf(path).size(); };
  if (parent != kNoExpr && syntax[parent].kind == ExprKind::kModulePath) {
    auto names = syntax.ChildrenOf(parent);
    names = names.first(std::min(names.size(), kMaxPathParts));
    if (std::ranges::find(names, named) == names.end()) return found;
    add_module(parent, static_cast<size_t>(std::ranges::find(names, named) - names.begin()) + 1);
    return found;
  }
  if (parent == kNoExpr || syntax[parent].kind != ExprKind::kImportAlias || exprs.empty()) return found;
  if (syntax.stmt(stmt).kind == StmtKind::kImport) {
    const ExprId path = syntax.ChildOf(parent, 0);
    add_module(path, whole(path));
    return found;
  }
  const ExprId path = exprs[0];
  const Text name = syntax.NameOf(syntax.ChildOf(parent, 0));
  return EntitiesOfImport(file.id, syntax[path].op, PathOf(syntax, path), name, depth);
}

Entities Inference::EntitiesOfImport(FileId importer, int level, Text path, Text name, int depth) {
  const ModuleId module = modules_.FindFrom(importer, level, path);
  if (module == kNoModule) return {};
  // A module that imports from itself, as a package does for its submodule, means the submodule.
  if (FileOfModule(module) == importer) {
    const ModuleId child = modules_.Child(module, name);
    return child == kNoModule ? Entities() : Entities{{{Entity::kModule, child, 0}}, 0};
  }
  return EntitiesInModule(module, name, depth + 1);
}

std::vector<Binding> Inference::BindingsOf(const Entity& entity) {
  std::vector<Binding> found;
  switch (entity.kind) {
    case Entity::kVariable: {
      const SourceFile* file = FileOf(entity.a);
      if (file == nullptr) break;
      for (const uint32_t i : file->occurrences().Of(entity.b))
        if (Binds(file->bindings.occurrences[i])) found.push_back({entity.a, file->bindings.occurrences[i].begin});
      break;
    }
    case Entity::kMember: {
      ClassInfo& info = MembersOf(entity.a);
      const Text name = NameOfNumber(entity.b);
      const SourceFile* file = FileOf(info.file);
      if (file == nullptr) break;
      if (const auto at = info.symbols.find(name); at != info.symbols.end())
        for (const uint32_t i : file->occurrences().Of(at->second))
          if (Binds(file->bindings.occurrences[i])) found.push_back({info.file, file->bindings.occurrences[i].begin});
      if (const auto at = info.self_attributes.find(name); at != info.self_attributes.end())
        for (const uint32_t offset : at->second) found.push_back({info.file, offset});
      for (const MadeField& field : info.fields)
        if (info.call != kNoExpr && field.name == name) found.push_back({info.file, field.offset});
      break;
    }
    case Entity::kModule: {
      const FileId file = modules_[entity.a].file != kNoFile ? modules_[entity.a].file : modules_[entity.a].stub;
      if (file != kNoFile) found.push_back({file, 0});
      break;
    }
  }
  std::ranges::sort(found);
  found.erase(std::unique(found.begin(), found.end()), found.end());
  return found;
}

const std::vector<Binding>& Inference::DefinitionsOf(const SourceFile& file, uint32_t symbol) {
  static constexpr size_t kMost = 64;
  return definitions_.Get(file.id, symbol, [&] {
    std::vector<Binding> found;
    for (const uint32_t i : file.occurrences().Of(symbol)) {
      const Occurrence& occurrence = file.bindings.occurrences[i];
      const bool is_defined = Binds(occurrence) && file.syntax.StatementNamedAt(occurrence.begin) != kModuleStmt;
      if (is_defined && found.size() < kMost) found.push_back({file.id, occurrence.begin});
    }
    return found;
  });
}

// ---- what they give ----

FrameId Inference::FrameFor(const SourceFile& file, uint32_t scope, FrameId frame) {
  if (frame == kNoFrame) return kNoFrame;
  for (; scope != kNoIndex; scope = file.bindings.scopes[scope].parent) {
    for (FrameId at = frame; at != kNoFrame; at = frames_[at].outer) {
      const FunctionInfo& info = functions_[frames_[at].function];
      if (info.file == file.id && info.scope == scope) return at;
    }
  }
  return kNoFrame;
}

bool Inference::IsBuiltin(Text name) {
  return !EntitiesOfBuiltin(name).found.empty() || !IsNone(NewNameOfBuiltin(name));
}

bool Inference::IsOfBuiltinsStub(Text name) {
  return (name.starts_with('_') && !name.starts_with("__")) || name == "function" || name == "ellipsis";
}

Entities Inference::EntitiesOfBuiltin(Text name) {
  const ModuleId builtins = modules_.Find("builtins");
  if (builtins == kNoModule) return {};
  if (IsOfBuiltinsStub(name)) return {};
  if (const SourceFile* file = FileOf(FileOfModule(builtins)); file != nullptr && file->is_stub) {
    const ModuleNames& names = NamesOfModule(*file);
    const auto at = names.symbols.find(name);
    const auto is_own = [file](uint32_t i) {
      const Occurrence& occurrence = file->bindings.occurrences[i];
      return Binds(occurrence) && occurrence.kind != NameKind::kImport;
    };
    if (at != names.symbols.end() && std::ranges::none_of(file->occurrences().Of(at->second), is_own)) return {};
  }
  return EntitiesInModule(builtins, name);
}

Value Inference::BuiltinNamed(Text name) {
  const Entities entities = EntitiesOfBuiltin(name);
  Value value;
  for (const Entity& entity : entities.found)
    if (entity.kind != Entity::kModule) value = types_.Union(value, ValueOfEntity(entity));
  if (value.IsKnown()) return value;
  const Text other = NewNameOfBuiltin(name);
  return IsNone(other) ? kUnknownValue : BuiltinNamed(other);
}

Value Inference::ValueOfName(const SourceFile& file, uint32_t index, FrameId frame) {
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const uint32_t variable = file.bindings.VariableOf(occurrence);
  if (variable == kNoIndex) return kUnknownValue;
  // What is declared is what it is, whatever it was given.
  for (const Binding& binding : AnnotatedBindings(file, variable)) {
    const Occurrence& other = file.bindings.occurrences[file.OccurrenceBeginningAt(binding.offset)];
    if (other.role == NameRole::kRead || file.syntax.stmt(file.syntax.StatementAt(other.begin)).hint == kNoExpr)
      continue;
    const Value value = ValueOfBinding(binding, frame);
    if (value.IsKnown()) return value;
  }
  const std::vector<Binding>& bindings = BindingsReaching(file, index);
  if (!bindings.empty()) {
    const Value value = ValueOfBindings(bindings, frame);
    if (value != NoneValue()) return value;
    // Nothing but None is what functions fill in that say `global` or `nonlocal`.
    Value filled;
    for (const uint32_t i : file.occurrences().Of(variable)) {
      const Occurrence& other = file.bindings.occurrences[i];
      uint32_t scope = file.bindings.ScopeOf(other);
      while (scope != kNoIndex && file.bindings.scopes[scope].kind == NameScopeKind::kComprehension)
        scope = file.bindings.scopes[scope].parent;
      if (other.kind != NameKind::kVariable || scope == file.bindings.symbols[variable].scope) continue;
      filled = types_.Union(filled, ValueOfBinding({file.id, other.begin}, frame));
    }
    return filled.IsKnown() ? types_.Union(value, {filled.set, Value::kGuessed}) : value;
  }
  const Text name = file.bindings.texts[file.bindings.symbols[variable].name];
  // Nothing in the file binds it: star imports, then what the language has.
  if (!NamesOfModule(file).stars.empty()) {
    const ModuleId own = modules_.OfFile(file.id);
    const Entities entities = own == kNoModule ? Entities() : EntitiesInModule(own, name);
    Value value{kNoTypes, entities.doubt};
    for (const Entity& entity : entities.found) value = types_.Union(value, ValueOfEntity(entity));
    if (value.IsKnown()) return value;
  }
  if (name == "__name__" || name == "__file__" || name == "__doc__" || name == "__qualname__" || name == "__module__")
    return InstanceNamed("builtins", "str");
  if (name == "__class__") {
    for (uint32_t scope = file.bindings.ScopeOf(occurrence); scope != kNoIndex;
         scope = file.bindings.scopes[scope].parent)
      if (const ClassId cls = ClassOfScope(file, scope); cls != kNoId) return Just(types_.Add(TypeKind::kClass, cls));
  }
  return BuiltinNamed(name);
}

Value Inference::ValueOfBindings(std::span<const Binding> bindings, FrameId frame) {
  Value value;
  for (const Binding& binding : bindings) {
    value = types_.Union(value, ValueOfBinding(binding, frame));
    if (IsInVain(value)) return kUnknownValue;
  }
  return value;
}

// An import of a module's name by the module itself leaves the name what it is.
void Inference::DropImportsOfItself(const SourceFile& file, std::vector<uint32_t>& bindings) {
  if (bindings.size() < 2) return;
  const auto is_of_itself = [&](uint32_t offset) {
    const ExprId named = file.syntax.NamedAt(offset);
    const ExprId alias = named == kNoExpr ? kNoExpr : file.syntax[named].parent;
    if (alias == kNoExpr || file.syntax[alias].kind != ExprKind::kImportAlias) return false;
    const Stmt& stmt = file.syntax.stmt(file.syntax.StatementAt(offset));
    const auto exprs = file.syntax.ExprsOf(stmt);
    if (stmt.kind != StmtKind::kFromImport || exprs.empty()) return false;
    const Text name = file.syntax.NameOf(named);
    if (file.syntax.NameOf(file.syntax.ChildOf(alias, 0)) != name) return false;
    const ModuleId module = modules_.FindFrom(file.id, file.syntax[exprs[0]].op, PathOf(file.syntax, exprs[0]));
    return module != kNoModule && FileOfModule(module) == file.id && modules_.Child(module, name) == kNoModule;
  };
  std::vector<uint32_t> others;
  std::ranges::remove_copy_if(bindings, std::back_inserter(others), is_of_itself);
  if (!others.empty()) bindings = std::move(others);
}

const std::vector<Binding>& Inference::BindingsAtEnd(const SourceFile& file, uint32_t symbol) {
  return at_end_.Get(file.id, symbol, [&] { return FindBindingsAtEnd(file, symbol); });
}

std::vector<Binding> Inference::FindBindingsAtEnd(const SourceFile& file, uint32_t symbol) {
  std::vector<uint32_t> own, elsewhere, reached;
  const NameSymbol& owner = file.bindings.symbols[symbol];
  for (const uint32_t i : file.occurrences().Of(symbol)) {
    const Occurrence& occurrence = file.bindings.occurrences[i];
    if (!Binds(occurrence) || !IsReachable(file, file.syntax.StatementAt(occurrence.begin))) continue;
    (file.bindings.ScopeOf(occurrence) == owner.scope ? own : elsewhere).push_back(occurrence.begin);
  }
  DropImportsOfItself(file, own);
  const NameScopeKind kind = file.bindings.scopes[owner.scope].kind;
  if (kind == NameScopeKind::kModule || kind == NameScopeKind::kClass || kind == NameScopeKind::kFunction) {
    const std::function<int(ExprId)> truth = [&](ExprId condition) { return StaticTruth(file, condition); };
    Flow(file, own, truth).ReachEnd(file.StmtOfScope(owner.scope), reached);
  }
  if (reached.empty()) reached = own;
  reached.insert(reached.end(), elsewhere.begin(), elsewhere.end());
  std::vector<Binding> found;
  for (const uint32_t offset : reached) found.push_back({file.id, offset});
  return found;
}

const std::vector<Binding>& Inference::AnnotatedBindings(const SourceFile& file, uint32_t symbol) {
  const auto find = [&] {
    std::vector<Binding> found;
    for (const uint32_t i : file.occurrences().Of(symbol)) {
      const Occurrence& occurrence = file.bindings.occurrences[i];
      if (occurrence.kind != NameKind::kVariable) continue;
      const StmtId stmt = file.syntax.StatementAt(occurrence.begin);
      if (file.syntax.stmt(stmt).kind == StmtKind::kAnnotated && IsReachable(file, stmt))
        found.push_back({file.id, occurrence.begin});
    }
    return found;
  };
  return annotated_.Get(file.id, symbol, find);
}

Value Inference::ValueOfVariable(const SourceFile& file, uint32_t symbol, FrameId frame) {
  Value declared;
  for (const Binding& binding : AnnotatedBindings(file, symbol))
    declared = types_.Union(declared, ValueOfBinding(binding, frame));
  return declared.IsKnown() ? declared : ValueOfBindings(BindingsAtEnd(file, symbol), frame);
}

Value Inference::ValueOfEntity(const Entity& entity) {
  switch (entity.kind) {
    case Entity::kVariable: {
      const SourceFile* file = FileOf(entity.a);
      return file == nullptr ? kUnknownValue : ValueOfVariable(*file, entity.b, kNoFrame);
    }
    case Entity::kMember:
      return AttributeOfType(types_.Add(TypeKind::kClass, entity.a), NameOfNumber(entity.b));
    case Entity::kModule:
      return Just(types_.Add(TypeKind::kModule, entity.a));
  }
  return kUnknownValue;
}

Value Inference::ValueOfBinding(Binding binding, FrameId frame) {
  if (const uint64_t key = KeyOf(binding.file, binding.offset, kNoFrame); frame == kNoFrame && key != 0) {
    if (const Value* known = bindings_.known.Find(key)) return *known;
  }
  const SourceFile* file = FileOf(binding.file);
  if (file == nullptr) return kUnknownValue;
  const uint32_t index = file->OccurrenceBeginningAt(binding.offset);
  if (index == kNoIndex) return kUnknownValue;
  const FrameId own = FrameFor(*file, file->bindings.ScopeOf(file->bindings.occurrences[index]), frame);
  const InFrame in_frame(*this, own);
  return Remembered(bindings_, KeyOf(binding.file, binding.offset, own),
                    [&] { return FindValueOfBinding(*file, binding.offset, own); });
}

Value Inference::ForeignValue(std::string name, Binding import) {
  static constexpr size_t kMaxName = 200;
  if (name.size() > kMaxName) return kUnknownValue;
  const uint32_t number = NumberOfName(name);
  imports_of_foreign_.try_emplace(number, import);
  return Just(types_.Add(TypeKind::kForeign, number), Value::kOpen);
}

Binding Inference::ImportOfForeign(uint32_t name) const {
  const auto known = imports_of_foreign_.find(name);
  return known == imports_of_foreign_.end() ? Binding() : known->second;
}

Value Inference::WithoutForeign(Value value) {
  std::vector<TypeId> rest;
  for (const TypeId id : types_.CopyOf(value.set))
    if (types_[id].kind != TypeKind::kForeign) rest.push_back(id);
  if (rest.size() == types_.SizeOf(value.set)) return value;
  return {types_.SetOf(rest), static_cast<uint8_t>(value.doubt | Value::kOpen)};
}

// The dotted name of what an import that leads nowhere binds; empty where the module is there and has no such name.
std::string Inference::ForeignNameOf(const SourceFile& file, uint32_t offset) {
  const FileSyntax& syntax = file.syntax;
  const ExprId named = syntax.NamedAt(offset);
  const ExprId parent = named == kNoExpr ? kNoExpr : syntax[named].parent;
  if (parent == kNoExpr) return {};
  if (syntax[parent].kind == ExprKind::kModulePath) return std::string(syntax.NameOf(syntax.ChildOf(parent, 0)));
  if (syntax[parent].kind != ExprKind::kImportAlias) return {};
  const Stmt& stmt = syntax.stmt(syntax.StatementOf(named));
  const auto exprs = syntax.ExprsOf(stmt);
  if (stmt.kind == StmtKind::kImport) return PathOf(syntax, syntax.ChildOf(parent, 0));
  if (stmt.kind != StmtKind::kFromImport || exprs.empty() || syntax[exprs[0]].op != 0) return {};
  const std::string module = PathOf(syntax, exprs[0]);
  if (modules_.FindFrom(file.id, 0, module) != kNoModule) return {};
  return module + "." + std::string(syntax.NameOf(syntax.ChildOf(parent, 0)));
}

Value Inference::ValueOfImport(const SourceFile& file, uint32_t offset) {
  const FileSyntax& syntax = file.syntax;
  const ExprId named = syntax.NamedAt(offset);
  // `import a.b` binds `a`.
  const Entities entities = EntitiesOfImport(file, offset);
  Value value{kNoTypes, entities.doubt};
  if (named == kNoExpr) return kUnknownValue;
  if (entities.found.empty()) {
    const std::string name = ForeignNameOf(file, offset);
    return name.empty() ? kUnknownValue : ForeignValue(name, {file.id, offset});
  }
  for (const Entity& entity : entities.found) value = types_.Union(value, ValueOfEntity(entity));
  return value;
}

Value Inference::FindValueOfBinding(const SourceFile& file, uint32_t offset, FrameId frame) {
  const Occurrence& occurrence = file.bindings.occurrences[file.OccurrenceBeginningAt(offset)];
  const FileSyntax& syntax = file.syntax;
  switch (occurrence.kind) {
    case NameKind::kImport:
      return ValueOfImport(file, offset);
    case NameKind::kClass: {
      const StmtId stmt = syntax.StatementNamedAt(offset);
      if (stmt == kModuleStmt) return kUnknownValue;
      if (file.is_stub && syntax.NameOf(syntax.stmt(stmt)) == "Any" &&
          modules_.Find("typing") == modules_.OfFile(file.id))
        return Just(types_.Add(TypeKind::kSpecial, static_cast<uint32_t>(SpecialForm::kAny)));
      return Just(types_.Add(TypeKind::kClass, ClassOfStmt(file.id, stmt)));
    }
    case NameKind::kFunction: {
      const StmtId stmt = syntax.StatementNamedAt(offset);
      if (stmt == kModuleStmt) return kUnknownValue;
      // The overloads stand in front of what implements them, and stand for it.
      std::vector<TypeId> overloads;
      const uint32_t variable = file.bindings.VariableOf(occurrence);
      if (variable != kNoIndex) {
        for (const uint32_t i : file.occurrences().Of(variable)) {
          const Occurrence& other = file.bindings.occurrences[i];
          if (other.kind != NameKind::kFunction) continue;
          const StmtId def = syntax.StatementNamedAt(other.begin);
          if (def == kModuleStmt || syntax.stmt(def).decorator_count == 0) continue;
          const FunctionId function = FunctionOfStmt(file.id, def);
          if ((functions_[function].flags & kIsOverload) != 0 && IsReachable(file, def))
            overloads.push_back(types_.Add(TypeKind::kFunction, function, frame));
        }
      }
      if (!overloads.empty()) {
        const Value all{types_.SetOf(overloads), 0};
        return (functions_[FunctionOfStmt(file.id, stmt)].flags & kIsOverload) != 0 ? all
                                                                                    : Decorated(file, stmt, all, frame);
      }
      return Decorated(file, stmt, Just(types_.Add(TypeKind::kFunction, FunctionOfStmt(file.id, stmt), frame)), frame);
    }
    case NameKind::kParameter: {
      const FunctionId function = FunctionOfScope(file, file.bindings.ScopeOf(occurrence));
      if (function == kNoId) return kUnknownValue;
      const auto parameters = ParametersOf(functions_[function]);
      const auto behind = std::ranges::upper_bound(parameters, offset, {},
                                                   [&syntax](ExprId parameter) { return syntax[parameter].begin; });
      if (behind == parameters.begin()) return kUnknownValue;
      const auto i = static_cast<size_t>(behind - parameters.begin()) - 1;
      if (syntax[parameters[i]].name_begin == offset) return ValueOfParameter(function, i, frame);
      // One of a tuple, as Python 2 has them.
      const ExprId tuple = syntax.ChildOf(parameters[i], 2), target = syntax.NamedAt(offset);
      if (tuple == kNoExpr || target == kNoExpr || offset >= syntax[tuple].end) return kUnknownValue;
      return Unpack(file, target, tuple, ValueOfParameter(function, i, frame), {}, frame);
    }
    case NameKind::kTypeParameter: {
      const ExprId parameter = syntax.NamedAt(offset);
      return parameter == kNoExpr ? kUnknownValue : Just(types_.Add(TypeKind::kTypeVar, file.id, parameter));
    }
    case NameKind::kTypeAlias: {
      const StmtId stmt = syntax.StatementAt(offset);
      const auto exprs = syntax.ExprsOf(syntax.stmt(stmt));
      if (exprs.empty()) return kUnknownValue;
      const Value hint = ValueOfHint(file.id, exprs.back(), frame);
      return hint.IsKnown() ? Just(types_.Add(TypeKind::kTypeForm, 0, 0, {hint.set}), hint.doubt) : kUnknownValue;
    }
    default: {
      const ExprId target = syntax.NamedAt(offset);
      return target == kNoExpr ? kUnknownValue : ValueOfTarget(file, target, frame);
    }
  }
}

Value Inference::DecoratedBelow(const SourceFile& file, StmtId stmt, ExprId decorator) {
  if (file.syntax.stmt(stmt).kind == StmtKind::kClass)
    return Just(types_.Add(TypeKind::kClass, ClassOfStmt(file.id, stmt)));
  const FunctionId function = FunctionOfStmt(file.id, stmt);
  return Decorated(file, stmt, Just(types_.Add(TypeKind::kFunction, function)), kNoFrame, decorator);
}

// Decorators from the inside out. One that says nothing leaves what it decorates, as a guess.
Value Inference::Decorated(const SourceFile& file, StmtId stmt, Value value, FrameId frame, ExprId until) {
  const FileSyntax& syntax = file.syntax;
  const auto decorators = syntax.DecoratorsOf(syntax.stmt(stmt));
  for (size_t i = decorators.size(); i-- > 0;) {
    const ExprId decorator = decorators[i];
    if (decorator == until) break;
    const Text name = syntax.NameOf(decorator);
    if (name == "staticmethod" || name == "classmethod" || name == "overload" || name == "abstractmethod" ||
        name == "override" || name == "final" || name == "type_check_only" || name == "deprecated")
      continue;
    if (syntax[decorator].kind == ExprKind::kAttribute && (name == "setter" || name == "getter" || name == "deleter")) {
      value = ValueOf(file.id, syntax.ChildOf(decorator, 0), frame);
      continue;
    }
    const Value callee = ValueOf(file.id, decorator, frame);
    std::vector<Argument> arguments(1);
    arguments[0].value = value;
    arguments[0].is_evaluated = true;
    const Value result =
        callee.IsKnown() ? WithoutForeign(ResultOf(callee, arguments, {file.id, decorator})) : kUnknownValue;
    if (result.IsKnown()) {
      value = {result.set, static_cast<uint8_t>(result.doubt | value.doubt)};
    } else {
      value.doubt |= Value::kOpen | Value::kGuessed;
    }
  }
  return value;
}

Value Inference::Entered(Value manager, bool is_async) {
  Value value = CallMethod(manager, is_async ? "__aenter__" : "__enter__", {});
  return is_async ? EvaluateAwait(value) : value;
}

// A class, or tuples and lists of classes. What goes on for ever, as a text does, which holds texts, catches nothing.
Value Inference::Caught(Value type, int depth) {
  static constexpr int kMaxNesting = 8;
  Value value{kNoTypes, type.doubt};
  if (depth > kMaxNesting) return value;
  for (const TypeId id : types_.CopyOf(type.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kClass) value = types_.Union(value, Just(InstanceOf(t.a)));
    if (t.kind == TypeKind::kTuple) {
      for (size_t i = 0; i < t.args_count; ++i)
        value = types_.Union(value, Caught({types_.ArgOf(id, i), 0}, depth + 1));
    } else if (t.kind == TypeKind::kInstance) {
      const Value items = IterationOf(Just(id));
      if (items.IsKnown()) value = types_.Union(value, Caught(items, depth + 1));
    }
  }
  return value;
}

// The value that a target gets of the value that the whole of its nest of targets gets.
Value Inference::Unpack(const SourceFile& file, ExprId target, ExprId root, Value value, ExprPlace source,
                        FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  std::vector<ExprId> path;
  for (ExprId at = target; at != root; at = syntax[at].parent) path.push_back(at);
  ExprId container = root;
  for (size_t step = path.size(); step-- > 0;) {
    const ExprId child = path[step];
    if (syntax[container].kind == ExprKind::kStarred) {  // the list of the rest, which its container made
      container = child;
      continue;
    }
    const auto targets = syntax.ChildrenOf(container);
    const auto index = static_cast<size_t>(std::ranges::find(targets, child) - targets.begin());
    size_t star = SIZE_MAX;
    for (size_t i = 0; i < targets.size(); ++i)
      if (syntax[targets[i]].kind == ExprKind::kStarred) star = i;
    // A display of as many items gives each target its own.
    if (source.expr != kNoExpr &&
        (syntax[source.expr].kind == ExprKind::kTuple || syntax[source.expr].kind == ExprKind::kList)) {
      const auto items = syntax.ChildrenOf(source.expr);
      const bool has_star =
          std::ranges::any_of(items, [&](ExprId item) { return syntax[item].kind == ExprKind::kStarred; });
      if (star != SIZE_MAX && !has_star && items.size() + 1 >= targets.size() &&
          syntax[source.expr].kind == ExprKind::kList) {
        const size_t behind = targets.size() - star - 1;
        if (index != star) {
          source.expr = items[index < star ? index : items.size() + index - targets.size()];
          value = ValueOf(file.id, source.expr, frame);
        } else {
          Value rest;
          for (size_t i = star; i + behind < items.size(); ++i)
            rest = types_.Union(rest, ValueOf(file.id, items[i], frame));
          value = InstanceNamed("builtins", "list", {WithoutLiterals(rest).Packed()});
          source.expr = kNoExpr;
        }
        container = child;
        continue;
      }
      if (items.size() == targets.size() && !has_star && star == SIZE_MAX) {
        source.expr = items[index];
        value = ValueOf(file.id, source.expr, frame);
        container = child;
        continue;
      }
    }
    source.expr = kNoExpr;
    Value item{kNoTypes, value.doubt};
    for (const TypeId id : types_.CopyOf(value.set)) {
      const Type t = types_[id];
      if (t.kind == TypeKind::kTuple && index != star) {
        size_t at = index;
        if (star != SIZE_MAX && index > star)
          at = t.args_count + index >= targets.size() ? t.args_count + index - targets.size() : SIZE_MAX;
        if (at < t.args_count) item = types_.Union(item, Value{types_.ArgOf(id, at), 0});
      } else if (t.kind == TypeKind::kTuple) {
        Value rest;
        const size_t behind = targets.size() - star - 1;
        for (size_t i = star; i + behind < t.args_count; ++i) rest = types_.Union(rest, Value{types_.ArgOf(id, i), 0});
        item = types_.Union(item, InstanceNamed("builtins", "list", {rest.Packed()}));
      } else if (const auto row =
                     star == SIZE_MAX && LiteralOf(t).starts_with('^') ? ItemsInOrder(id, 0) : std::vector<Value>();
                 row.size() == targets.size()) {
        item = types_.Union(item, row[index]);
      } else if (t.kind == TypeKind::kInstance && star == SIZE_MAX && InfoOf(t.a).is_named_tuple &&
                 index < MembersOf(t.a).fields.size()) {
        item = types_.Union(item, AttributeOfType(id, MembersOf(t.a).fields[index].name));
      } else {
        const Value items = IterationOf(Just(id));
        item = types_.Union(item, index == star ? InstanceNamed("builtins", "list", {items.Packed()}) : items);
      }
    }
    value = item;
    container = child;
  }
  return value;
}

Value Inference::ValueOfTarget(const SourceFile& file, ExprId target, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  ExprId root = target;
  const auto is_container = [&](ExprId expr) {
    const ExprKind kind = syntax[expr].kind;
    return kind == ExprKind::kTuple || kind == ExprKind::kList || kind == ExprKind::kStarred;
  };
  while (syntax[root].parent != kNoExpr && is_container(syntax[root].parent)) root = syntax[root].parent;
  const ExprId parent = syntax[root].parent;
  if (syntax[root].kind == ExprKind::kPatternCapture || syntax[root].kind == ExprKind::kPatternStar)
    return ValueOfPattern(file, root, frame);
  if (parent != kNoExpr) {
    switch (syntax[parent].kind) {
      case ExprKind::kWithItem: {
        const StmtId stmt = syntax.StatementOf(parent);
        const bool is_async = (syntax.stmt(stmt).flags & kAsyncStmt) != 0;
        if (syntax.stmt(stmt).hint != kNoExpr) {
          const Value hint = ValueOfHint(file.id, syntax.stmt(stmt).hint, frame);
          if (hint.IsKnown()) return Unpack(file, target, root, hint, {}, frame);
        }
        const Value entered = Entered(ValueOf(file.id, syntax.ChildOf(parent, 0), frame), is_async);
        return Unpack(file, target, root, entered, {}, frame);
      }
      case ExprKind::kComprehensionFor: {
        const bool is_async = (syntax[parent].flags & kAsyncClause) != 0;
        const ExprId iterable = syntax.ChildOf(parent, 1);
        return Unpack(file, target, root, IterationOf(ValueOf(file.id, iterable, frame), is_async), {}, frame);
      }
      case ExprKind::kNamed:
        return ValueOf(file.id, syntax.ChildOf(parent, 1), frame);
      case ExprKind::kPatternAs:
        return ValueOfPattern(file, syntax.ChildOf(parent, 0), frame);
      default:
        return kUnknownValue;
    }
  }
  const StmtId id = syntax.StatementOf(root);
  const Stmt& stmt = syntax.stmt(id);
  const auto exprs = syntax.ExprsOf(stmt);
  if (stmt.kind == StmtKind::kAssign || stmt.kind == StmtKind::kAnnotated) {
    const Value form = file.is_stub ? FormOf(file, target) : kUnknownValue;
    if (form.IsKnown()) return form;
  }
  switch (stmt.kind) {
    case StmtKind::kAssign: {
      if (stmt.hint != kNoExpr) {
        const Value hint = ValueOfHint(file.id, stmt.hint, frame);
        if (hint.IsKnown()) return Unpack(file, target, root, hint, {}, frame);
      }
      const ExprId value = exprs.back();
      if (root == target) return WithItemsPutInto(file, target, ValueOf(file.id, value, frame));
      return Unpack(file, target, root, ValueOf(file.id, value, frame), {file.id, value}, frame);
    }
    case StmtKind::kAnnotated: {
      const Text hinted = syntax.NameOf(stmt.hint);
      if (hinted == "TypeAlias" && exprs.size() > 1) {
        const Value alias = ValueOfHint(file.id, exprs[1], frame);
        return alias.IsKnown() ? Just(types_.Add(TypeKind::kTypeForm, 0, 0, {alias.set}), alias.doubt) : kUnknownValue;
      }
      const Value hint = ValueOfHint(file.id, stmt.hint, frame);
      if (hint.IsKnown() || exprs.size() < 2) return hint;
      return ValueOf(file.id, exprs[1], frame);
    }
    case StmtKind::kAugmentedAssign: {
      if (exprs.size() < 2) return kUnknownValue;
      const Value before = ValueOf(file.id, exprs[0], frame);
      static constexpr std::array<std::tuple<Text, Text, Text>, 13> kOperators{
          {{"+=", "__add__", "__radd__"},
           {"-=", "__sub__", "__rsub__"},
           {"*=", "__mul__", "__rmul__"},
           {"/=", "__truediv__", "__rtruediv__"},
           {"//=", "__floordiv__", "__rfloordiv__"},
           {"%=", "__mod__", "__rmod__"},
           {"**=", "__pow__", "__rpow__"},
           {"|=", "__or__", "__ror__"},
           {"&=", "__and__", "__rand__"},
           {"^=", "__xor__", "__rxor__"},
           {"<<=", "__lshift__", "__rlshift__"},
           {">>=", "__rshift__", "__rrshift__"},
           {"@=", "__matmul__", "__rmatmul__"}}};
      for (const auto& [text, method, reflected] : kOperators) {
        if (CodeOfText(text) != stmt.op) continue;
        const std::string in_place = "__i" + std::string(method.substr(2));
        bool has_method = false;
        const Value result = CallMethod(before, in_place, {ValueOf(file.id, exprs[1], frame)}, &has_method);
        if (has_method && result.IsKnown()) return result;
        const Value operated = Operate(before, ValueOf(file.id, exprs[1], frame), method, reflected);
        return operated.IsKnown() ? operated : Value{before.set, static_cast<uint8_t>(before.doubt | Value::kOpen)};
      }
      return before;
    }
    case StmtKind::kFor: {
      if (exprs.size() < 2) return kUnknownValue;
      if (stmt.hint != kNoExpr) {
        const Value hint = ValueOfHint(file.id, stmt.hint, frame);
        if (hint.IsKnown()) return Unpack(file, target, root, hint, {}, frame);
      }
      const Value iterable = ValueOf(file.id, exprs[1], frame);
      return Unpack(file, target, root, IterationOf(iterable, (stmt.flags & kAsyncStmt) != 0), {}, frame);
    }
    case StmtKind::kExcept: {
      const Value caught = exprs.empty() ? kUnknownValue : Caught(ValueOf(file.id, exprs[0], frame));
      if ((stmt.flags & kExceptGroup) == 0) return caught;
      Value group = InstanceNamed("builtins", "ExceptionGroup", {caught.Packed()});
      group.doubt |= caught.doubt;
      return group;
    }
    default:
      return kUnknownValue;
  }
}

// What a pattern, or the name in it, stands for in what is matched.
Value Inference::ValueOfPattern(const SourceFile& file, ExprId pattern, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  if (syntax[pattern].kind == ExprKind::kPatternClass) {
    const Value cls = ValueOf(file.id, syntax.ChildOf(pattern, 0), frame);
    if (cls.IsKnown()) return Caught(cls);
  }
  if (syntax[pattern].kind == ExprKind::kPatternOr) {
    Value value;
    for (const ExprId alternative : syntax.ChildrenOf(pattern))
      value = types_.Union(value, ValueOfPattern(file, alternative, frame));
    return value;
  }
  if (syntax[pattern].kind == ExprKind::kPatternValue) return ValueOf(file.id, syntax.ChildOf(pattern, 0), frame);
  const ExprId parent = syntax[pattern].parent;
  if (parent == kNoExpr) {
    const StmtId match = syntax.stmt(syntax.StatementOf(pattern)).parent;
    const auto subject = syntax.ExprsOf(syntax.stmt(match));
    return subject.empty() ? kUnknownValue : ValueOf(file.id, subject[0], frame);
  }
  const auto children = syntax.ChildrenOf(parent);
  const auto index = static_cast<size_t>(std::ranges::find(children, pattern) - children.begin());
  switch (syntax[parent].kind) {
    case ExprKind::kPatternAs: {
      const ExprId around = syntax[parent].parent;
      if (around == kNoExpr) {
        const StmtId match = syntax.stmt(syntax.StatementOf(parent)).parent;
        const auto subject = syntax.ExprsOf(syntax.stmt(match));
        return subject.empty() ? kUnknownValue : ValueOf(file.id, subject[0], frame);
      }
      return ValueOfPattern(file, around, frame);
    }
    case ExprKind::kPatternOr: {
      const ExprId around = syntax[parent].parent;
      if (around != kNoExpr) return ValueOfPattern(file, around, frame);
      const auto subject = syntax.ExprsOf(syntax.stmt(syntax.stmt(syntax.StatementOf(parent)).parent));
      return subject.empty() ? kUnknownValue : ValueOf(file.id, subject[0], frame);
    }
    case ExprKind::kPatternSequence: {
      const Value whole = ValueOfPattern(file, parent, frame);
      Value item{kNoTypes, whole.doubt};
      const bool has_star = std::ranges::any_of(
          children.first(index), [&](ExprId child) { return syntax[child].kind == ExprKind::kPatternStar; });
      for (const TypeId id : types_.CopyOf(whole.set)) {
        if (types_[id].kind == TypeKind::kTuple && !has_star && index < types_[id].args_count) {
          item = types_.Union(item, Value{types_.ArgOf(id, index), 0});
        } else {
          item = types_.Union(item, IterationOf(Just(id)));
        }
      }
      return syntax[pattern].kind == ExprKind::kPatternStar ? InstanceNamed("builtins", "list", {item.Packed()}) : item;
    }
    case ExprKind::kPatternMapping: {
      const Value whole = ValueOfPattern(file, parent, frame);
      if (syntax[pattern].kind == ExprKind::kPatternStar) return whole;
      const ExprId key = index > 0 ? children[index - 1] : kNoExpr;
      const ExprId value = key == kNoExpr                                ? kNoExpr
                           : syntax[key].kind == ExprKind::kPatternValue ? syntax.ChildOf(key, 0)
                                                                         : key;
      return ItemOf(whole, file, std::span(&value, 1), frame);
    }
    case ExprKind::kKeyword: {
      const ExprId cls = syntax[parent].parent;
      return cls == kNoExpr ? kUnknownValue : AttributeOf(ValueOfPattern(file, cls, frame), syntax.NameOf(parent));
    }
    case ExprKind::kPatternClass: {
      const Value whole = ValueOfPattern(file, parent, frame);
      Value value{kNoTypes, whole.doubt};
      for (const TypeId id : types_.CopyOf(whole.set)) {
        if (types_[id].kind != TypeKind::kInstance) continue;
        ClassInfo& info = MembersOf(types_[id].a);
        if (index >= 1 && index - 1 < info.fields.size()) {
          value = types_.Union(value, AttributeOf(Just(id), info.fields[index - 1].name));
          continue;
        }
        const Value names = AttributeOf(Just(types_.Add(TypeKind::kClass, types_[id].a)), "__match_args__");
        bool has_name = false;
        for (const TypeId tuple : types_.CopyOf(names.set)) {
          if (types_[tuple].kind != TypeKind::kTuple || index < 1) continue;
          for (const TypeId name : types_.CopyOf(types_.ArgOf(tuple, index - 1))) {
            const Text text = LiteralOf(types_[name]);
            if (text.size() < 2) continue;
            has_name = true;
            value = types_.Union(value, AttributeOf(Just(id), text.substr(1, text.size() - 2)));
          }
        }
        if (!has_name) value = types_.Union(value, index == 1 ? Just(id, Value::kOpen) : kUnknownValue);
      }
      return value;
    }
    default:
      return kUnknownValue;
  }
}

// What statements put into a container, and into the containers that it holds.
struct Inference::Puts {
  Value keys, items;
  bool is_known = false;
  std::unique_ptr<Puts> inner;
};

// Of what `use` stands for: a name, or what is taken out of it by a key.
void Inference::CollectPuts(const SourceFile& file, ExprId use, Puts& puts, int depth) {
  static constexpr int kMaxNesting = 2;
  const FileSyntax& syntax = file.syntax;
  const ExprId parent = syntax[use].parent;
  const auto inner = [&](ExprId taken) {
    if (depth == kMaxNesting) return;
    if (puts.inner == nullptr) puts.inner = std::make_unique<Puts>();
    CollectPuts(file, taken, *puts.inner, depth + 1);
    puts.is_known = puts.is_known || puts.inner->is_known;
  };
  const auto add_item = [&](Value item) {
    puts.items = types_.Union(puts.items, item);
    puts.is_known = true;
  };
  const auto add_entry = [&](Value key, Value item) {
    puts.keys = types_.Union(puts.keys, key);
    add_item(item);
  };
  // All that another container holds.
  const auto add_all = [&](ExprId from) {
    if (from == kNoExpr) return;
    const Value all = ValueOf(file.id, from);
    const ClassId mapping = ClassNamed("typing", "Mapping");
    for (const TypeId id : types_.CopyOf(all.set)) {
      if (types_[id].kind == TypeKind::kInstance && IsSubclass(types_[id].a, mapping)) {
        add_entry({ArgsAs(id, mapping, 0), 0}, {ArgsAs(id, mapping, 1), 0});
      } else {
        add_item(IterationOf(Just(id)));
      }
    }
  };
  const StmtId at = syntax.StatementAt(syntax[use].begin);
  const Stmt& stmt = syntax.stmt(at);
  const auto exprs = syntax.ExprsOf(stmt);
  if (parent == kNoExpr) {
    if (stmt.kind == StmtKind::kAugmentedAssign && exprs.size() == 2 && exprs[0] == use &&
        (stmt.op == CodeOfText("+=") || stmt.op == CodeOfText("|=")))
      add_all(exprs[1]);
    return;
  }
  if (syntax[parent].kind == ExprKind::kAttribute && syntax.ChildOf(parent, 0) == use) {
    const ExprId call = syntax[parent].parent;
    if (call == kNoExpr || syntax[call].kind != ExprKind::kCall || syntax.ChildOf(call, 0) != parent) return;
    const Text method = syntax.NameOf(parent);
    const ExprId first = syntax.ChildOf(call, 1), second = syntax.ChildOf(call, 2);
    if (first == kNoExpr) return;
    if (method == "append" || method == "add" || method == "appendleft") {
      add_item(ValueOf(file.id, first));
    } else if (method == "insert") {
      if (second != kNoExpr) add_item(ValueOf(file.id, second));
    } else if (method == "extend" || method == "extendleft") {
      add_item(IterationOf(ValueOf(file.id, first)));
    } else if (method == "update" || method == "__ior__") {
      for (const ExprId argument : syntax.ChildrenOf(call).subspan(1)) {
        if (syntax[argument].kind == ExprKind::kKeyword) {
          add_entry(InstanceNamed("builtins", "str"), ValueOf(file.id, syntax.ChildOf(argument, 0)));
        } else if (syntax[argument].kind != ExprKind::kStarred) {
          add_all(syntax[argument].kind == ExprKind::kDoubleStarred ? syntax.ChildOf(argument, 0) : argument);
        }
      }
    } else if (method == "setdefault") {
      add_entry(ValueOf(file.id, first), second == kNoExpr ? NoneValue() : ValueOf(file.id, second));
      inner(call);
    } else if (method == "__setitem__" && second != kNoExpr) {
      add_entry(ValueOf(file.id, first), ValueOf(file.id, second));
    }
    return;
  }
  if (syntax[parent].kind == ExprKind::kSubscript && syntax.ChildOf(parent, 0) == use) {
    const ExprId key = syntax.ChildOf(parent, 1);
    const bool is_own_target = (syntax[parent].flags & kIsTarget) != 0 && syntax[parent].parent == kNoExpr;
    if (is_own_target && stmt.kind == StmtKind::kAssign) {
      const Value given = ValueOf(file.id, exprs.back());
      if (key != kNoExpr && syntax[key].kind == ExprKind::kSlice) {
        add_item(IterationOf(given));
      } else {
        add_entry(ValueOf(file.id, key), given);
      }
    } else if (is_own_target && stmt.kind == StmtKind::kAugmentedAssign) {
      puts.keys = types_.Union(puts.keys, ValueOf(file.id, key));
      inner(parent);
    } else if ((syntax[parent].flags & kIsTarget) == 0) {
      inner(parent);
    }
    return;
  }
  // `heapq.heappush(heap, item)`
  if (syntax[parent].kind == ExprKind::kCall && syntax.ChildOf(parent, 1) == use) {
    const ExprId callee = syntax.ChildOf(parent, 0), second = syntax.ChildOf(parent, 2);
    const Text name = callee == kNoExpr                             ? kNoText
                      : syntax[callee].kind == ExprKind::kAttribute ? syntax.NameOf(callee)
                                                                    : syntax.TextOf(syntax[callee]);
    if (second != kNoExpr && (name == "heappush" || name == "heappushpop" || name.starts_with("insort")))
      add_item(ValueOf(file.id, second));
  }
}

// A container with what was put into it.
Value Inference::WithPuts(Value container, const Puts& puts) {
  if (!puts.is_known) return container;
  const ClassId mapping = ClassNamed("typing", "Mapping");
  Value result{kNoTypes, container.doubt};
  for (const TypeId id : types_.CopyOf(container.set)) {
    const Type t = types_[id];
    const bool is_container = t.kind == TypeKind::kInstance && (t.args_count == 1 || t.args_count == 2) &&
                              modules_[modules_.OfFile(classes_[t.a].file)].name != "types";
    if (!is_container) {
      result = types_.Union(result, Just(id));
      continue;
    }
    const bool is_mapping = IsSubclass(t.a, mapping);
    std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
    // Others may put something into it.
    if (is_mapping && args.size() == 2) args[0] = types_.Union(args[0], WithoutLiterals(puts.keys).Packed()) | kOpenSet;
    TypeSetId& items = args.back();
    if (!is_mapping || args.size() == 2) items = types_.Union(items, WithoutLiterals(puts.items).Packed()) | kOpenSet;
    if (puts.inner != nullptr) items = WithPuts({WithoutOpen(items), 0}, *puts.inner).set | (items & kOpenSet);
    result = types_.Union(result, Just(types_.Add(TypeKind::kInstance, t.a, 0, args)));
  }
  return result;
}

// A value that a name is given, where it is a container that statements behind may put something into: with what they
// put.
Value Inference::WithItemsPutInto(const SourceFile& file, ExprId target, Value held) {
  const FileSyntax& syntax = file.syntax;
  const ExprId value = syntax.ExprsOf(syntax.stmt(syntax.StatementOf(target))).back();
  const auto is_container = [&](auto&& self, ExprId expr) -> bool {
    switch (syntax[expr].kind) {
      case ExprKind::kList:
      case ExprKind::kDict:
      case ExprKind::kSet:
      case ExprKind::kListComprehension:
      case ExprKind::kDictComprehension:
      case ExprKind::kSetComprehension:
        return true;
      case ExprKind::kBinary:
        return self(self, syntax.ChildOf(expr, 0));
      case ExprKind::kCall: {
        const ExprId callee = syntax.ChildOf(expr, 0);
        const Text name =
            syntax[callee].kind == ExprKind::kAttribute ? syntax.NameOf(callee) : syntax.TextOf(syntax[callee]);
        static constexpr Text kContainers[] = {"list", "dict", "set", "deque", "defaultdict", "OrderedDict", "Counter"};
        return std::ranges::find(kContainers, name) != std::end(kContainers);
      }
      default:
        return false;
    }
  };
  if (!is_container(is_container, value)) return held;
  std::vector<uint32_t> uses;  // offsets of the name
  const uint32_t index =
      file.OccurrenceBeginningAt(syntax[target].name_end > 0 ? syntax[target].name_begin : syntax[target].begin);
  if (index == kNoIndex) return held;
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const uint32_t variable = file.bindings.VariableOf(occurrence);
  static constexpr size_t kMaxUses = 200;
  if (variable != kNoIndex) {
    for (const uint32_t i : file.occurrences().Of(variable)) {
      if (uses.size() < kMaxUses) uses.push_back(file.bindings.occurrences[i].begin);
    }
  } else {
    // An attribute: the same name behind the same receiver's name, in the class around.
    StmtId around = syntax.StatementAt(occurrence.begin);
    while (around != kModuleStmt && syntax.stmt(around).kind != StmtKind::kClass) around = syntax.stmt(around).parent;
    if (around == kModuleStmt) return held;
    const uint32_t end = syntax.stmt(around).block_end;
    const auto& all = file.bindings.occurrences;
    const uint32_t own_receiver = file.bindings.ReceiverOf(index);
    if (own_receiver == kNoIndex) return held;
    auto at = std::ranges::lower_bound(all, syntax.stmt(around).begin, {}, &Occurrence::begin);
    for (; at != all.end() && at->begin < end && uses.size() < kMaxUses; ++at) {
      if (!at->is_attribute || at->text != occurrence.text) continue;
      const uint32_t receiver = file.bindings.ReceiverOf(static_cast<uint32_t>(at - all.begin()));
      if (receiver != kNoIndex && all[receiver].text == all[own_receiver].text) uses.push_back(at->begin);
    }
  }
  Puts puts;
  for (const uint32_t offset : uses) {
    const ExprId use = syntax.NamedAt(offset);
    if (use != kNoExpr && use != target) CollectPuts(file, use, puts, 0);
  }
  return puts.is_known ? WithPuts(WithoutDisplay(held), puts) : held;
}

}  // namespace quillet
