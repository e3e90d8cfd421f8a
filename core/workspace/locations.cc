// Definitions: where what a name stands for is bound.
#include <algorithm>
#include <span>
#include <utility>

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

// What a plain string holds.
Text TextInString(Text string) {
  while (!string.empty() && string.front() != '\'' && string.front() != '"') string.remove_prefix(1);
  return string.size() >= 2 ? string.substr(1, string.size() - 2) : Text();
}

}  // namespace

uint32_t Workspace::Impl::OccurrenceAt(const SourceFile& file, uint32_t offset) {
  if (const uint32_t at = file.OccurrenceBeginningAt(offset); at != kNoIndex) return at;
  return file.OccurrenceAt(offset);
}

Location Workspace::Impl::AtOccurrence(const SourceFile& file, uint32_t index, Certainty certainty) {
  const Occurrence& occurrence = file.bindings.occurrences[index];
  Location location;
  location.file = file.id;
  location.begin = occurrence.begin;
  location.end = file.bindings.EndOf(occurrence);
  location.role = NameRoleWords()[static_cast<size_t>(occurrence.role)];
  if (occurrence.binds()) location.kind = NameKindWords()[static_cast<size_t>(occurrence.kind) - 1];
  location.certainty = certainty;
  return location;
}

Location Workspace::Impl::At(const Binding& binding, Certainty certainty) {
  Location location;
  location.file = binding.file;
  location.begin = location.end = binding.offset;
  location.certainty = certainty;
  const SourceFile* file = Get(binding.file);
  if (file == nullptr) {
    location.role = "module";
    return location;
  }
  const uint32_t index = file->OccurrenceBeginningAt(binding.offset);
  if (index != kNoIndex) {
    Location found = AtOccurrence(*file, index, certainty);
    // A write of an attribute is where it is defined.
    if (found.kind.empty()) found.kind = "variable";
    return found;
  }
  // A field in the string of a named tuple.
  const Text text = file->text();
  while (location.end < text.size() &&
         (IsNone(text)
              ? false
              : (std::isalnum(static_cast<unsigned char>(text[location.end])) != 0 || text[location.end] == '_')))
    ++location.end;
  location.role = "definition";
  location.kind = "variable";
  return location;
}

Binding Workspace::Impl::SourceOf(Binding binding) {
  const SourceFile* file = Get(binding.file);
  return file != nullptr && file->is_stub ? OtherSideOf(binding) : binding;
}

Binding Workspace::Impl::OtherSideOf(Binding binding) {
  const std::vector<Binding> others = OtherSidesOf(binding);
  return others.empty() ? binding : others.front();
}

// Of what a stub declares where its source defines it, and the other way around.
std::vector<Binding> Workspace::Impl::OtherSidesOf(Binding binding) {
  const SourceFile* stub = Get(binding.file);
  if (stub == nullptr) return {};
  const ModuleId id = modules.OfFile(binding.file);
  const FileId other = id == kNoModule ? kNoFile : stub->is_stub ? modules[id].file : modules[id].stub;
  if (other == kNoFile || other == binding.file) return {};
  const SourceFile* source = Get(other);
  const uint32_t index = stub->OccurrenceBeginningAt(binding.offset);
  if (source == nullptr || index == kNoIndex) return {};
  // The dotted way to the name, from the module in.
  std::vector<Text> path{stub->bindings.TextOf(stub->bindings.occurrences[index])};
  for (uint32_t scope = stub->bindings.ScopeOf(stub->bindings.occurrences[index]); scope != 0 && scope != kNoIndex;
       scope = stub->bindings.scopes[scope].parent) {
    const NameScope& around = stub->bindings.scopes[scope];
    if (around.kind == NameScopeKind::kClass) path.push_back(stub->bindings.NameOf(around));
  }
  Entities at = inference.EntitiesInFile(id, other, path.back());
  for (size_t i = path.size() - 1; i-- > 0;) {
    // Of a class that is there under another name as well: `C = other.C`.
    Value value;
    for (const Entity& entity : at.found) value = inference.types().Union(value, inference.ValueOfEntity(entity));
    at = {};
    for (const TypeId type : inference.types().CopyOf(value.set)) {
      const Type t = inference.types()[type];
      if (t.kind != TypeKind::kClass) continue;
      if (const auto member = inference.FindMember(t.a, path[i]))
        at.found.push_back(inference.EntityOfMember(*member, path[i]));
    }
  }
  for (const Entity& entity : at.found) {
    if (entity.kind == Entity::kModule) continue;
    const std::vector<Binding> bindings = inference.BindingsOf(entity);
    if (bindings.empty() || bindings.front().file == binding.file) continue;
    // A name that stands for a class or function leads to it.
    const SourceFile* there = Get(bindings.front().file);
    const uint32_t occurrence = there == nullptr ? kNoIndex : there->OccurrenceBeginningAt(bindings.front().offset);
    const NameKind kind = stub->bindings.occurrences[index].kind;
    if (occurrence != kNoIndex && there->bindings.occurrences[occurrence].kind == NameKind::kVariable &&
        (kind == NameKind::kClass || kind == NameKind::kFunction)) {
      const Value value = inference.ValueOfEntity(entity);
      for (const TypeId type : inference.types().CopyOf(value.set)) {
        const Type t = inference.types()[type];
        FileId file = kNoFile;
        StmtId stmt = kModuleStmt;
        if (t.kind == TypeKind::kClass) {
          file = inference.InfoOf(t.a).file;
          stmt = inference.InfoOf(t.a).stmt;
        } else if (t.kind == TypeKind::kFunction) {
          file = inference.function(t.a).file;
          stmt = inference.function(t.a).stmt;
        }
        if (stmt != kModuleStmt && Get(file) != nullptr) return {{file, Get(file)->syntax.stmt(stmt).name_begin}};
      }
    }
    return bindings;
  }
  return {};
}

void Workspace::Impl::Sort(std::vector<Location>& locations) const {
  std::ranges::sort(locations, [&](const Location& a, const Location& b) {
    if (a.file != b.file) return files.PathOf(a.file) < files.PathOf(b.file);
    return std::pair(a.begin, a.certainty) < std::pair(b.begin, b.certainty);
  });
  const auto is_same = [](const Location& a, const Location& b) { return a.file == b.file && a.begin == b.begin; };
  locations.erase(std::unique(locations.begin(), locations.end(), is_same), locations.end());
}

std::vector<Location> Workspace::Impl::LocationsOf(const Entities& entities, bool follows_source) {
  std::vector<Location> found;
  const Certainty certainty = CertaintyOf(entities.doubt);
  for (const Entity& entity : entities.found) {
    std::vector<Binding> bindings = inference.BindingsOf(entity);
    // Of what a module assigns again and again, what it is left with.
    const SourceFile* owner = entity.kind == Entity::kVariable ? Get(entity.a) : nullptr;
    if (owner != nullptr && owner->bindings.symbols[entity.b].scope == 0) {
      bindings = inference.BindingsAtEnd(*owner, entity.b);
      const bool has_several = bindings.size() > 1;
      std::erase_if(bindings, [&](const Binding& binding) {
        const uint32_t at = owner->OccurrenceBeginningAt(binding.offset);
        return has_several && at != kNoIndex && owner->bindings.occurrences[at].kind == NameKind::kImport;
      });
    }
    // What is declared somewhere is defined there, wherever else it is assigned.
    std::vector<Binding> declared;
    for (const Binding& binding : bindings) {
      const SourceFile* file = entity.kind == Entity::kModule ? nullptr : Get(binding.file);
      if (file == nullptr) continue;
      const StmtId stmt = file->syntax.StatementAt(binding.offset);
      const bool is_annotated = file->syntax.stmt(stmt).kind == StmtKind::kAnnotated;
      if (is_annotated || file->syntax.StatementNamedAt(binding.offset) != kModuleStmt) declared.push_back(binding);
    }
    if (!declared.empty()) bindings = std::move(declared);
    // What the version asked for never sees is no definition, unless nothing else is.
    std::vector<Binding> seen;
    for (const Binding& binding : bindings) {
      const SourceFile* file = Get(binding.file);
      if (file != nullptr && inference.IsReachable(*file, file->syntax.StatementAt(binding.offset)))
        seen.push_back(binding);
    }
    if (!seen.empty()) bindings = std::move(seen);
    for (const Binding& binding : bindings) {
      if (entity.kind == Entity::kModule) {
        Location location;
        location.file = binding.file;
        location.role = "module";
        location.kind = "module";
        location.certainty = certainty;
        found.push_back(location);
        continue;
      }
      const bool is_stub = follows_source && Get(binding.file) != nullptr && Get(binding.file)->is_stub;
      const std::vector<Binding> sources = is_stub ? OtherSidesOf(binding) : std::vector<Binding>();
      for (const Binding& source : sources) found.push_back(At(source, certainty));
      // A stub that somebody wrote for this project is worth seeing as well.
      if (sources.empty() || IsProject(binding.file)) found.push_back(At(binding, certainty));
    }
  }
  return found;
}

// The bound is one of the files that define such a member, in the order of their paths: how many more are looked at
// depends on what is known of them.
std::vector<Location> Workspace::Impl::MembersNamed(Text name) {
  static constexpr size_t kMaxDefiners = 400;
  static constexpr size_t kFilesAtOnce = 256;
  std::vector<Location> found;
  size_t definers = 0;
  const std::vector<FileId> candidates = project.DefiningMember(name);
  for (size_t i = 0; i < candidates.size(); ++i) {
    if (i % kFilesAtOnce == 0)
      defined.ReadForMember(std::span(candidates).subspan(i, std::min(kFilesAtOnce, candidates.size() - i)), name);
    const uint32_t number = defined.Find(name);
    if (number == kNoIndex) continue;
    bool is_definer = false;
    for (const DefinedNames::Definition& definition : defined.Of(candidates[i])) {
      if (definition.name != number || !(definition.in_class || definition.of_self)) continue;
      if (!std::exchange(is_definer, true) && ++definers > kMaxDefiners) {
        is_bounded = true;
        return found;
      }
      Location location;
      location.file = candidates[i];
      location.begin = definition.begin;
      location.end = definition.begin + static_cast<uint32_t>(name.size());
      location.role = NameRoleWords()[static_cast<size_t>(definition.role)];
      // A write of an attribute is where it is defined.
      const NameKind kind = definition.of_self ? NameKind::kVariable : definition.kind;
      location.kind = NameKindWords()[static_cast<size_t>(kind) - 1];
      location.certainty = Certainty::kByName;
      found.push_back(location);
    }
  }
  return found;
}

Value Workspace::Impl::ExpectedOf(const SourceFile& file, ExprId expr) {
  const FileSyntax& syntax = file.syntax;
  const ExprId parent = syntax[expr].parent;
  if (parent == kNoExpr) {
    const Stmt& stmt = syntax.stmt(syntax.StatementOf(expr));
    if (stmt.kind == StmtKind::kAnnotated || stmt.kind == StmtKind::kAssign)
      return stmt.hint == kNoExpr ? kUnknownValue : inference.ValueOfHint(file.id, stmt.hint);
    return kUnknownValue;
  }
  if (syntax[parent].kind == ExprKind::kDict) {
    const auto children = syntax.ChildrenOf(parent);
    const auto index = static_cast<size_t>(std::ranges::find(children, expr) - children.begin());
    if (index % 2 == 0) return kUnknownValue;
    Value value;
    const Text key = TextInString(syntax.TextOf(syntax[children[index - 1]]));
    for (const TypeId type : inference.types().CopyOf(ExpectedOf(file, parent).set))
      value = inference.types().Union(value, inference.AttributeOf(inference.Just(type), key));
    return value;
  }
  const bool is_keyword = syntax[parent].kind == ExprKind::kKeyword;
  const ExprId call = is_keyword ? syntax[parent].parent : parent;
  if (call == kNoExpr || syntax[call].kind != ExprKind::kCall) return kUnknownValue;
  const auto arguments = syntax.ChildrenOf(call).subspan(1);
  const auto position = static_cast<size_t>(std::ranges::find(arguments, expr) - arguments.begin());
  Value value;
  for (const TypeId type : inference.types().CopyOf(inference.ValueOf(file.id, syntax.ChildOf(call, 0)).set)) {
    const Type t = inference.types()[type];
    if (t.kind != TypeKind::kFunction) continue;
    const FunctionInfo info = inference.function(t.a);
    const SourceFile* source = Get(info.file);
    const auto parameters = inference.ParametersOf(info);
    for (size_t i = 0; i < parameters.size(); ++i) {
      const bool is_it =
          is_keyword ? source->syntax.NameOf(parameters[i]) == syntax.NameOf(parent) : i == position + t.args_count;
      const ExprId hint = is_it ? inference.HintOfParameter(*source, info, i) : kNoExpr;
      if (hint != kNoExpr) value = inference.types().Union(value, inference.ValueOfHint(info.file, hint));
    }
  }
  return value;
}

std::vector<Location> Workspace::Impl::KeyDefinitions(const SourceFile& file, uint32_t offset) {
  std::vector<Location> found;
  const FileSyntax& syntax = file.syntax;
  const ExprId string = syntax.ExpressionAt(offset);
  if (string == kNoExpr || syntax[string].kind != ExprKind::kString || syntax[string].parent == kNoExpr) return found;
  const ExprId parent = syntax[string].parent;
  Value owner;
  if (syntax[parent].kind == ExprKind::kSubscript && syntax.ChildOf(parent, 0) != string) {
    owner = inference.ValueOf(file.id, syntax.ChildOf(parent, 0));
  } else if (syntax[parent].kind == ExprKind::kDict || syntax[parent].kind == ExprKind::kSet) {
    const auto children = syntax.ChildrenOf(parent);
    const auto index = static_cast<size_t>(std::ranges::find(children, string) - children.begin());
    if (syntax[parent].kind == ExprKind::kSet || index % 2 == 0) owner = ExpectedOf(file, parent);
  }
  if (syntax[parent].kind == ExprKind::kCall && syntax[parent].children_count > 1 &&
      syntax.ChildOf(parent, 1) == string) {
    const ExprId method = syntax.ChildOf(parent, 0);
    const Text name = syntax.NameOf(method);
    if (syntax[method].kind == ExprKind::kAttribute && (name == "get" || name == "pop" || name == "setdefault"))
      owner = inference.ValueOf(file.id, syntax.ChildOf(method, 0));
  }
  const Text key = TextInString(syntax.TextOf(syntax[string]));
  for (const TypeId type : inference.types().CopyOf(owner.set)) {
    const Type t = inference.types()[type];
    if (t.kind != TypeKind::kInstance || !inference.InfoOf(t.a).is_typed_dict) continue;
    const auto member = inference.FindMember(t.a, key);
    if (!member) continue;
    for (const Binding& binding : inference.BindingsOf(inference.EntityOfMember(*member, key)))
      found.push_back(At(binding, CertaintyOf(owner.doubt)));
  }
  Sort(found);
  return found;
}

// Of a test's parameter the fixture that gives it.
void Workspace::Impl::AddFixture(const SourceFile& file, uint32_t occurrence, std::vector<Location>& found) {
  const uint32_t variable = file.bindings.VariableOf(file.bindings.occurrences[occurrence]);
  const bool is_given = std::ranges::any_of(found, [](const Location& at) {
    return at.kind == NameKindWords()[static_cast<size_t>(NameKind::kParameter) - 1];
  });
  if (variable == kNoIndex || !is_given) return;
  const FunctionId function = inference.FunctionOfScope(file, file.bindings.symbols[variable].scope);
  if (function == kNoId) return;
  const FunctionId fixture =
      inference.FixtureOf(inference.function(function), file.bindings.TextOf(file.bindings.occurrences[occurrence]));
  const SourceFile* source = fixture == kNoId ? nullptr : Get(inference.function(fixture).file);
  if (source == nullptr) return;
  const StmtId stmt = inference.function(fixture).stmt;
  found.push_back(At({source->id, source->syntax.stmt(stmt).name_begin}, Certainty::kLikely));
}

std::vector<Location> Workspace::Definitions(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return {};
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return in.KeyDefinitions(*file, offset);
  const Occurrence& occurrence = file->bindings.occurrences[index];
  std::vector<Location> found;
  if (occurrence.has_symbol && occurrence.binds() && occurrence.kind != NameKind::kImport &&
      occurrence.role != NameRole::kRead) {
    found.push_back(in.AtOccurrence(*file, index, Certainty::kCertain));
    in.AddFixture(*file, index, found);
    return found;
  }
  if (occurrence.has_symbol && !occurrence.binds()) {
    for (const Binding& binding : in.inference.BindingsReaching(*file, index)) {
      const uint32_t at = file->OccurrenceBeginningAt(binding.offset);
      if (at != kNoIndex && file->bindings.occurrences[at].kind == NameKind::kImport) {
        const std::vector<Location> imported = in.LocationsOf(in.inference.EntitiesOfImport(*file, binding.offset));
        if (imported.empty()) found.push_back(in.At(binding, Certainty::kCertain));
        found.insert(found.end(), imported.begin(), imported.end());
      } else {
        found.push_back(in.At(binding, Certainty::kCertain));
      }
    }
    if (!found.empty()) {
      in.Sort(found);
      in.AddFixture(*file, index, found);
      return found;
    }
  }
  const Entities entities = in.inference.EntitiesOf(*file, index);
  found = in.LocationsOf(entities);
  if (found.empty() && occurrence.is_attribute) {
    const ExprId named = file->syntax.NamedAt(occurrence.begin);
    if (named != kNoExpr) found = in.MembersBelow(*file, named);
  }
  if (found.empty() && occurrence.is_attribute) {
    const Text name = file->bindings.TextOf(occurrence);
    const bool is_special = name.starts_with("__") && name.ends_with("__");
    if (!is_special) found = in.MembersNamed(name);
    // The only one there is, of a name that no type of the language has.
    if (found.size() == 1 && !in.IsCommonAttribute(name)) found[0].certainty = Certainty::kLikely;
  }
  if (occurrence.is_attribute && found.empty() &&
      (occurrence.role == NameRole::kWrite || occurrence.role == NameRole::kDefinition))
    found.push_back(in.AtOccurrence(*file, index, Certainty::kLikely));
  in.Sort(found);
  std::ranges::stable_sort(found, {}, &Location::certainty);
  return found;
}

std::vector<Location> Workspace::TypeDefinitions(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return {};
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return {};
  std::vector<Location> found;
  const Value value = in.ValueAt(*file, index);
  for (const TypeId type : in.inference.types().CopyOf(value.set)) {
    const Type t = in.inference.types()[type];
    const ClassId cls = t.kind == TypeKind::kClass ? t.a : in.inference.ClassOfType(type);
    if (cls == kNoId) continue;
    const ClassInfo& info = in.inference.InfoOf(cls);
    const SourceFile* source = in.Get(info.file);
    if (source == nullptr) continue;
    const uint32_t begin =
        info.stmt != kModuleStmt ? source->syntax.stmt(info.stmt).name_begin : source->syntax[info.call].begin;
    found.push_back(in.At(in.SourceOf({info.file, begin}), CertaintyOf(value.doubt)));
  }
  in.Sort(found);
  return found;
}

// The methods that a place names.
Entities Workspace::Impl::MethodsAt(const SourceFile& file, uint32_t occurrence) {
  Entities methods = inference.EntitiesOf(file, occurrence);
  std::erase_if(methods.found, [&](const Entity& entity) {
    if (entity.kind != Entity::kMember) return true;
    return std::ranges::none_of(inference.BindingsOf(entity), [&](const Binding& binding) {
      const SourceFile* source = Get(binding.file);
      const uint32_t at = source == nullptr ? kNoIndex : source->OccurrenceBeginningAt(binding.offset);
      return at != kNoIndex && source->bindings.occurrences[at].kind == NameKind::kFunction;
    });
  });
  return methods;
}

std::vector<Location> Workspace::Supertypes(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return {};
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return {};
  std::vector<Location> found;
  const Entities methods = in.MethodsAt(*file, index);
  for (const Entity& method : methods.found) {
    // The next that has it in the order of bases.
    const Text name = in.inference.NameOfNumber(method.b);
    const std::vector<BaseClass> order = in.inference.InfoOf(method.a).order;
    for (size_t i = 1; i < order.size(); ++i) {
      if (!in.inference.MembersOf(order[i].cls).symbols.contains(name)) continue;
      const auto member = in.inference.FindMember(order[i].cls, name);
      if (!member) continue;
      for (const Binding& binding : in.inference.BindingsOf(in.inference.EntityOfMember(*member, name)))
        found.push_back(in.At(in.SourceOf(binding), CertaintyOf(methods.doubt)));
      break;
    }
  }
  if (!methods.found.empty()) {
    in.Sort(found);
    return found;
  }
  for (const TypeId type : in.inference.types().CopyOf(in.ValueAt(*file, index).set)) {
    const Type t = in.inference.types()[type];
    if (t.kind != TypeKind::kClass && t.kind != TypeKind::kInstance) continue;
    const std::vector<BaseClass> bases = in.inference.InfoOf(t.a).bases;
    for (const BaseClass& base : bases) {
      const ClassInfo& info = in.inference.InfoOf(base.cls);
      const SourceFile* source = in.Get(info.file);
      if (source != nullptr && info.stmt != kModuleStmt)
        found.push_back(
            in.At(in.SourceOf({info.file, source->syntax.stmt(info.stmt).name_begin}), Certainty::kCertain));
    }
  }
  in.Sort(found);
  return found;
}

std::vector<Location> Workspace::Subtypes(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return {};
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return {};
  std::vector<Location> found;
  const Entities methods = in.MethodsAt(*file, index);
  for (const Entity& method : methods.found) {
    const Text name = in.inference.NameOfNumber(method.b);
    for (const FileId candidate : in.project.WithWords({name})) {
      const Impl::Visit visit(in, candidate);
      const SourceFile* source = visit.file;
      if (source == nullptr) continue;
      for (StmtId stmt = 1; stmt < source->syntax.stmts.size(); ++stmt) {
        if (source->syntax.stmt(stmt).kind != StmtKind::kClass) continue;
        const ClassId sub = in.inference.ClassOfStmt(candidate, stmt);
        if (sub == method.a || !in.inference.MembersOf(sub).symbols.contains(name) ||
            !in.inference.IsSubclass(sub, method.a))
          continue;
        const auto member = in.inference.FindMember(sub, name);
        if (!member) continue;
        for (const Binding& binding : in.inference.BindingsOf(in.inference.EntityOfMember(*member, name)))
          found.push_back(in.At(binding, CertaintyOf(methods.doubt)));
      }
    }
  }
  if (!methods.found.empty()) {
    in.Sort(found);
    return found;
  }
  std::vector<ClassId> wanted;
  for (const TypeId type : in.inference.types().CopyOf(in.ValueAt(*file, index).set)) {
    const Type t = in.inference.types()[type];
    if (t.kind == TypeKind::kClass || t.kind == TypeKind::kInstance) wanted.push_back(t.a);
  }
  for (const ClassId cls : wanted) {
    const std::string name(in.inference.InfoOf(cls).name);
    for (const FileId candidate : in.project.WithWords({name})) {
      const Impl::Visit visit(in, candidate);
      const SourceFile* source = visit.file;
      if (source == nullptr || NumberOfText(source->bindings, name) == kNoIndex) continue;
      for (StmtId stmt = 1; stmt < source->syntax.stmts.size(); ++stmt) {
        if (source->syntax.stmt(stmt).kind != StmtKind::kClass) continue;
        const ClassId sub = in.inference.ClassOfStmt(candidate, stmt);
        const auto& bases = in.inference.InfoOf(sub).bases;
        if (std::ranges::any_of(bases, [&](const BaseClass& base) { return base.cls == cls; }))
          found.push_back(in.At({candidate, source->syntax.stmt(stmt).name_begin}, Certainty::kCertain));
      }
    }
  }
  in.Sort(found);
  return found;
}

}  // namespace quillet
