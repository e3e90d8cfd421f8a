// What imports lead to: names of modules, stars, packages, and what no file here holds.
#include <algorithm>

#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

namespace {

// A module's path, as far as paths of modules go.
constexpr size_t kMaxPathParts = 64;
std::string PathOf(const FileSyntax& syntax, ExprId path, size_t parts = SIZE_MAX) {
  return syntax.DottedNameOf(path, std::min(parts, kMaxPathParts + 1));
}

}  // namespace

const Inference::ModuleNames& Inference::NamesOfModule(const SourceFile& file) {
  const auto [at, is_new] = module_names_.try_emplace(file.id);
  ModuleNames& names = at->second;
  if (!is_new) return names;
  const Afresh afresh(*this, kMaxDepth / 4);
  const Bindings& bindings = file.bindings;
  for (uint32_t symbol = bindings.scopes[0].first_symbol; symbol != kNoIndex; symbol = bindings.symbols[symbol].next) {
    const auto indices = file.occurrences().Of(symbol);
    if (std::ranges::any_of(indices, [&](uint32_t i) { return bindings.occurrences[i].binds(); }))
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
        if (!occurrence.binds()) continue;
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

}  // namespace quillet
