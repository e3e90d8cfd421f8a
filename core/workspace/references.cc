// Uses of a name, everywhere, and what renaming it changes.
#include <algorithm>
#include <array>
#include <optional>
#include <unordered_map>

#include "program/name_imports.h"
#include "program/two_threads.h"
#include "workspace/workspace_impl.h"

namespace quillet {

// Whether a type that every program uses has an attribute of this name.
bool Workspace::Impl::IsCommonAttribute(Text name) {
  const auto [at, is_new] = common_.try_emplace(std::string(name), false);
  if (!is_new) return at->second;
  static constexpr std::array<Text, 9> kClasses{"str",   "list", "dict",  "set",      "tuple",
                                                "bytes", "int",  "float", "frozenset"};
  bool is_common = false;
  for (const Text cls : kClasses) {
    const ClassId id = inference.ClassNamed("builtins", cls);
    is_common = is_common || (id != kNoId && inference.FindMember(id, name) != nullptr);
  }
  for (const Text cls : {Text("IO"), Text("Generator")}) {
    const ClassId id = inference.ClassNamed("typing", cls);
    is_common = is_common || (id != kNoId && inference.FindMember(id, name) != nullptr);
  }
  common_[std::string(name)] = is_common;
  return is_common;
}

bool Workspace::Impl::Meets(const Entities& use, const std::vector<Entity>& targets, Certainty& certainty) {
  bool has_met = false;
  certainty = Certainty::kByName;
  const auto meet = [&](Certainty found) {
    has_met = true;
    certainty = std::min(certainty, found);
  };
  for (const Entity& entity : use.found) {
    for (const Entity& target : targets) {
      if (entity == target) {
        meet(CertaintyOf(use.doubt));
        continue;
      }
      if (entity.kind != Entity::kMember || target.kind != Entity::kMember || entity.b != target.b) continue;
      if (!inference.IsSubclass(entity.a, target.a) && !inference.IsSubclass(target.a, entity.a)) continue;
      // What methods of both classes give their instances is one attribute; what a class defines anew is another.
      const Text name = inference.NameOfNumber(entity.b);
      const auto is_written = [&](ClassId cls) {
        const ClassInfo& info = inference.MembersOf(cls);
        return !info.symbols.contains(name) && info.self_attributes.contains(name);
      };
      if (is_written(entity.a) && is_written(target.a)) meet(CertaintyOf(use.doubt));
    }
  }
  return has_met;
}

// Whether all is known of what an attribute is taken from: what has no such attribute then is not meant.
bool Workspace::Impl::IsReceiverKnown(const SourceFile& file, const Occurrence& occurrence) {
  const ExprId named = file.syntax.NamedAt(occurrence.begin);
  if (named == kNoExpr || file.syntax[named].kind != ExprKind::kAttribute) return false;
  const Value receiver = inference.ValueOf(file.id, file.syntax.ChildOf(named, 0));
  if (!receiver.IsKnown() || receiver.doubt != 0) return false;
  for (const TypeId type : inference.types().CopyOf(receiver.set)) {
    const Type t = inference.types()[type];
    const ClassId cls = t.kind == TypeKind::kClass ? t.a : inference.ClassOfType(type);
    if (cls == kNoId || inference.InfoOf(cls).open_from != SIZE_MAX || inference.FindMember(cls, "__getattr__"))
      return false;
  }
  return true;
}

// What a stub declares and what its source defines are one.
void Workspace::Impl::AddOtherSides(Entities& entities) {
  const size_t count = entities.found.size();
  for (size_t i = 0; i < count; ++i) {
    const Entity entity = entities.found[i];
    if (entity.kind == Entity::kModule) continue;
    const std::vector<Binding> bindings = inference.BindingsOf(entity);
    if (bindings.empty()) continue;
    const Binding other = OtherSideOf(bindings.front());
    const SourceFile* file = Get(other.file);
    if (other == bindings.front() || file == nullptr) continue;
    const uint32_t at = file->OccurrenceBeginningAt(other.offset);
    if (at == kNoIndex) continue;
    const uint32_t variable = file->bindings.VariableOf(file->bindings.occurrences[at]);
    if (variable != kNoIndex) entities.found.push_back(inference.EntityOfVariable(*file, variable));
  }
}

Entities Workspace::Impl::Meant(const SourceFile& file, uint32_t index) {
  Entities meant = inference.EntitiesOf(file, index);
  // The name behind `as` is one of this file.
  const uint32_t variable = file.bindings.VariableOf(file.bindings.occurrences[index]);
  if (variable != kNoIndex) {
    for (const uint32_t i : file.occurrences().Of(variable)) {
      const Occurrence& other = file.bindings.occurrences[i];
      if (other.kind != NameKind::kImport || other.role != NameRole::kDefinition) continue;
      meant.found.push_back({Entity::kVariable, file.id, variable});
      break;
    }
  }
  return meant;
}

// What a variable of a module is called by elsewhere was imported from there, or stands behind a dot. So where the text
// of a file has no dot in front of the name, the file's imports alone say whether it can be meant.
void Workspace::Impl::LeaveOutOtherImports(std::vector<FileId>& candidates, Text name,
                                           const std::vector<Entity>& wanted) {
  static constexpr size_t kFilesWorthIt = 32;
  if (candidates.size() < kFilesWorthIt || wanted.empty() || name.starts_with("__")) return;
  const ModuleId builtins = modules.Find("builtins");
  for (const Entity& entity : wanted) {
    if (entity.kind != Entity::kVariable) return;
    const SourceFile* owner = Get(entity.a);
    // Every file has the names of builtins without an import.
    if (owner == nullptr || owner->bindings.symbols[entity.b].scope != 0 || modules.OfFile(entity.a) == builtins)
      return;
  }
  std::vector<std::optional<std::vector<NameImport>>> imports(candidates.size());
  std::array<std::string, 2> memories;
  ForEachByThreads(candidates.size(), kFilesWorthIt, memories, [&](size_t i, std::string& memory) {
    imports[i] = ImportsOfName(files.SourceOf(candidates[i], memory), name);
  });
  const auto is_wanted = [&](const Entity& entity) { return std::ranges::find(wanted, entity) != wanted.end(); };
  size_t kept = 0;
  for (size_t i = 0; i < candidates.size(); ++i) {
    const FileId file = candidates[i];
    const ModuleId module = modules.OfFile(file);
    // What a stub says of a module holds in its source as well.
    const bool has_two_files =
        module != kNoModule && modules[module].stub != kNoFile && modules[module].file != kNoFile;
    const auto is_import_wanted = [&](const NameImport& import) {
      const Text imported = import.name.empty() ? name : Text(import.name);
      const Entities meant = inference.EntitiesOfImport(file, import.level, import.module, imported);
      return std::ranges::any_of(meant.found, is_wanted);
    };
    if (has_two_files || !imports[i] ||
        std::ranges::any_of(wanted, [&](const Entity& entity) { return entity.a == file; }) ||
        std::ranges::any_of(*imports[i], is_import_wanted))
      candidates[kept++] = file;
  }
  candidates.resize(kept);
}

std::vector<Workspace::Impl::Hit> Workspace::Impl::Uses(const SourceFile& file, uint32_t index, bool everywhere) {
  std::vector<Hit> hits;
  const Occurrence occurrence = file.bindings.occurrences[index];
  const FileId own = file.id;
  const std::string name(file.bindings.TextOf(occurrence));
  Entities wanted = Meant(file, index);
  if (wanted.found.empty()) {
    // An attribute of what is not known: every one of its name.
    if (!occurrence.is_attribute) return hits;
    if (IsReceiverKnown(file, occurrence)) {
      hits.push_back({AtOccurrence(file, index, Certainty::kCertain), file.id, index});
      return hits;
    }
  }
  const bool is_by_name = wanted.found.empty();
  AddOtherSides(wanted);
  bool is_local = !is_by_name;
  bool has_member = is_by_name;
  for (const Entity& entity : wanted.found) {
    if (entity.kind == Entity::kMember) has_member = true;
    if (entity.kind != Entity::kVariable) {
      is_local = false;
      continue;
    }
    const SourceFile* owner = Get(entity.a);
    if (owner == nullptr) continue;
    const NameScopeKind kind = owner->bindings.scopes[owner->bindings.symbols[entity.b].scope].kind;
    const bool is_parameter = (owner->bindings.symbols[entity.b].uses & NameSymbol::kParameter) != 0;
    if (entity.a != file.id ||
        (kind != NameScopeKind::kFunction && kind != NameScopeKind::kLambda && kind != NameScopeKind::kComprehension) ||
        is_parameter)
      is_local = false;
  }
  std::vector<FileId> candidates;
  if (is_local || !everywhere) {
    candidates.push_back(file.id);
  } else {
    candidates = project.WithWords({name});
    for (const Entity& entity : wanted.found) {
      const FileId owner = entity.kind == Entity::kVariable ? entity.a
                           : entity.kind == Entity::kMember ? inference.InfoOf(entity.a).file
                                                            : kNoFile;
      if (owner != kNoFile && std::ranges::find(candidates, owner) == candidates.end()) candidates.push_back(owner);
    }
    if (std::ranges::find(candidates, file.id) == candidates.end()) candidates.push_back(file.id);
    // What an editor shows of a library is looked at as if it were the project's.
    for (const FileId buffer : files.Buffers())
      if (!IsProject(buffer) && files.Holds(buffer, name) && std::ranges::find(candidates, buffer) == candidates.end())
        candidates.push_back(buffer);
    LeaveOutOtherImports(candidates, name, wanted.found);
  }
  for (const Entity& entity : wanted.found) {
    if (entity.kind != Entity::kModule) continue;
    Location location;
    location.file = modules[entity.a].file != kNoFile ? modules[entity.a].file : modules[entity.a].stub;
    location.role = location.kind = "module";
    if (location.file != kNoFile) hits.push_back({location, location.file, kNoIndex});
  }
  // Strings in `__slots__`, which say the attribute.
  for (const Entity& entity : wanted.found) {
    if (entity.kind != Entity::kMember) continue;
    const ClassInfo& info = inference.MembersOf(entity.a);
    const SourceFile* source = info.symbols.contains("__slots__") ? Get(info.file) : nullptr;
    if (source == nullptr || (!everywhere && info.file != file.id)) continue;
    for (const MadeField& slot : inference.SlotsOf(*source, info.stmt)) {
      if (slot.name != name) continue;
      Location location;
      location.file = source->id;
      location.begin = slot.offset;
      location.end = slot.offset + static_cast<uint32_t>(name.size());
      location.role = "declaration";
      hits.push_back({location, source->id, kNoIndex});
    }
  }
  // How many classes define an attribute of this name: what is used of an unknown receiver is likely the only one.
  std::vector<Hit> unknown;
  std::set<std::pair<FileId, uint32_t>> definers;
  VisitAll visits(*this, candidates);
  for (size_t next = 0; next < candidates.size(); ++next) {
    const FileId id = candidates[next];
    if (IsMuchRemembered()) {
      ForgetFound();
      wanted = Meant(*Get(own), index);  // classes have other numbers now
      AddOtherSides(wanted);
    }
    const Visit visit = visits.At(next);
    const SourceFile* source = visit.file;
    if (source == nullptr) continue;
    const Bindings& bindings = source->bindings;
    const uint32_t number = NumberOfText(bindings, name);
    if (number == kNoIndex) continue;
    struct Known {
      bool meets;
      Certainty certainty;
    };
    std::unordered_map<uint32_t, Known> variables;
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
      const Occurrence& other = bindings.occurrences[i];
      if (other.text != number) continue;
      inference.BeginPart();
      const uint32_t variable = bindings.VariableOf(other);
      Certainty certainty = Certainty::kCertain;
      bool meets = false;
      if (has_member && variable != kNoIndex && other.kind != NameKind::kNone) {
        const uint32_t scope = bindings.ScopeOf(other);
        if (bindings.scopes[scope].kind == NameScopeKind::kClass) definers.emplace(id, scope);
      }
      if (is_by_name) {
        if (other.is_attribute ||
            (variable != kNoIndex && bindings.scopes[bindings.symbols[variable].scope].kind == NameScopeKind::kClass))
          hits.push_back({AtOccurrence(*source, i, Certainty::kByName), id, i});
        continue;
      }
      if (variable != kNoIndex && other.role != NameRole::kImport) {
        const auto known = variables.find(variable);
        if (known != variables.end()) {
          meets = known->second.meets;
          certainty = known->second.certainty;
        } else {
          Entities use = inference.EntitiesOf(*source, i);
          use.found.push_back({Entity::kVariable, id, variable});
          meets = Meets(use, wanted.found, certainty);
          variables.emplace(variable, Known{meets, certainty});
        }
      } else {
        const Entities use = inference.EntitiesOf(*source, i);
        meets = Meets(use, wanted.found, certainty);
        if (!meets && use.found.empty() && has_member && !IsReceiverKnown(*source, other) &&
            (other.is_attribute || other.role == NameRole::kKeyword)) {
          if (other.is_attribute) {
            Location location = AtOccurrence(*source, i, Certainty::kByName);
            unknown.push_back({location, id, i});
          }
          continue;
        }
      }
      const bool is_foreign = id != own && !IsProject(id) && !files.IsOpen(id);
      if (meets &&
          (!is_foreign || other.kind != NameKind::kNone || (other.is_attribute && other.role == NameRole::kWrite)))
        hits.push_back({AtOccurrence(*source, i, certainty), id, i});
    }
    // Names in `__all__`.
    for (const Entity& entity : wanted.found) {
      if (entity.kind != Entity::kVariable && entity.kind != Entity::kModule) continue;
      for (StmtId stmt = 1; stmt < source->syntax.stmts.size(); ++stmt) {
        const Stmt& at = source->syntax.stmt(stmt);
        const auto exprs = source->syntax.ExprsOf(at);
        if ((at.kind != StmtKind::kAssign && at.kind != StmtKind::kAugmentedAssign) || exprs.size() != 2 ||
            source->syntax.NameOf(exprs[0]).size() + source->syntax.TextOf(source->syntax[exprs[0]]).size() == 0 ||
            source->syntax.TextOf(source->syntax[exprs[0]]) != "__all__")
          continue;
        for (const ExprId item : source->syntax.ChildrenOf(exprs[1])) {
          const Text text = source->syntax.TextOf(source->syntax[item]);
          if (source->syntax[item].kind != ExprKind::kString || text.size() != name.size() + 2 ||
              text.substr(1, name.size()) != name)
            continue;
          const ModuleId module = modules.OfFile(id);
          Certainty certainty = Certainty::kCertain;
          if (module == kNoModule || !Meets(inference.EntitiesInModule(module, name), wanted.found, certainty))
            continue;
          Location location;
          location.file = id;
          location.begin = source->syntax[item].begin + 1;
          location.end = location.begin + static_cast<uint32_t>(name.size());
          location.role = "read";
          location.certainty = certainty;
          hits.push_back({location, id, kNoIndex});
        }
      }
      break;
    }
  }
  if (!unknown.empty()) {
    const bool is_special = name.starts_with("__") && name.ends_with("__");
    const bool is_unique = definers.size() <= 1 && !is_special && !IsCommonAttribute(name);
    for (Hit& hit : unknown) {
      if (is_unique) hit.location.certainty = Certainty::kLikely;
      hits.push_back(hit);
    }
  }
  return hits;
}

// A call of a parameter's function that is given keywords which its place does not spell, such as `f(**options)`.
Binding Workspace::Impl::CallWithUnseenKeywords(const Entity& entity) {
  const SourceFile* owner = entity.kind == Entity::kVariable ? Get(entity.a) : nullptr;
  if (owner == nullptr || (owner->bindings.symbols[entity.b].uses & NameSymbol::kParameter) == 0) return {};
  const FunctionId function = inference.FunctionOfScope(*owner, owner->bindings.symbols[entity.b].scope);
  if (function == kNoId) return {};
  const FunctionInfo info = inference.function(function);
  const auto parameters = inference.ParametersOf(info);
  const Text name = owner->bindings.texts[owner->bindings.symbols[entity.b].name];
  for (size_t i = 0; i < parameters.size(); ++i) {
    const Expr& parameter = owner->syntax[parameters[i]];
    if (owner->syntax.NameOf(parameters[i]) != name) continue;
    const bool is_receiver = i == 0 && info.cls != kNoId && (info.flags & kIsStatic) == 0;
    if (is_receiver || parameter.op != static_cast<uint8_t>(ParameterKind::kPlain)) return {};
  }
  for (const ExprPlace& call : CallsOf(info)) {
    const SourceFile* file = Get(call.file);
    if (file == nullptr || file->syntax[call.expr].kind != ExprKind::kCall) continue;
    for (const ExprId argument : file->syntax.ChildrenOf(call.expr).subspan(1))
      if (file->syntax[argument].kind == ExprKind::kDoubleStarred) return {call.file, file->syntax[argument].begin};
  }
  return {};
}

std::vector<Location> Workspace::References(FileId id, uint32_t offset, bool everywhere) {
  Impl& in = *impl_;
  if (everywhere) {
    in.BeginAnew();
  } else {
    in.Begin();
  }
  const SourceFile* file = in.Get(id);
  if (file == nullptr) return {};
  const uint32_t index = in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return {};
  std::vector<Location> found;
  for (const Impl::Hit& hit : in.Uses(*file, index, everywhere)) found.push_back(hit.location);
  in.Sort(found);
  return found;
}

Rename Workspace::RenameTo(FileId id, uint32_t offset, Text name, bool only_certain) {
  Impl& in = *impl_;
  in.BeginAnew();
  Rename rename;
  const SourceFile* file = in.Get(id);
  const uint32_t index = file == nullptr ? kNoIndex : in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) {
    rename.problem = "there is no name here";
    return rename;
  }
  const bool is_identifier = !name.empty() && CodeOfText(name) == tok::NAME;
  if (!is_identifier) {
    rename.problem = "'" + std::string(name) + "' is no name that code can use";
    return rename;
  }
  const Occurrence occurrence = file->bindings.occurrences[index];
  const std::string old_name(file->bindings.TextOf(occurrence));
  Entities wanted = in.inference.EntitiesOf(*file, index);
  in.AddOtherSides(wanted);
  if (wanted.found.empty()) {
    rename.problem = "nothing is known of what '" + old_name + "' stands for here";
    return rename;
  }
  bool is_bound = false;
  if (old_name.starts_with("__") && old_name.ends_with("__")) {
    rename.problem = "'" + old_name + "' is a name that the language uses";
    return rename;
  }
  for (const Entity& entity : wanted.found) {
    if (entity.kind == Entity::kMember) {
      // What a library calls by its name keeps it.
      const std::vector<BaseClass> order = in.inference.InfoOf(entity.a).order;
      for (const BaseClass& base : order) {
        const ClassInfo& info = in.inference.MembersOf(base.cls);
        if (in.IsProject(info.file) || !info.symbols.contains(old_name)) continue;
        rename.problem = "'" + old_name + "' overrides what '" + in.inference.QualifiedName(base.cls) +
                         "' defines outside of the project";
        return rename;
      }
    }
    if (entity.kind == Entity::kModule) {
      rename.problem = "'" + old_name + "' is a module: rename its file";
      return rename;
    }
    for (const Binding& binding : in.inference.BindingsOf(entity)) {
      is_bound = true;
      if (!in.IsProject(binding.file)) {
        rename.problem = "'" + old_name + "' is defined outside of the project, in " + in.files.PathOf(binding.file);
        return rename;
      }
    }
  }
  if (!is_bound) {
    rename.problem = "nothing is known of what '" + old_name + "' stands for here";
    return rename;
  }
  if (only_certain) {
    for (const Entity& entity : wanted.found) {
      const Binding call = in.CallWithUnseenKeywords(entity);
      const SourceFile* source = call.file == kNoFile ? nullptr : in.Get(call.file);
      if (source == nullptr) continue;
      rename.problem = "'" + std::string(old_name) + "' may be given by '**' in " + source->path + ", at line " +
                       std::to_string(source->PlaceOf(call.offset).line);
      return rename;
    }
  }
  std::vector<Impl::Hit> hits = in.Uses(*file, index, true);
  std::optional<Impl::Visit> visit;  // of the file of the hits that follow each other
  FileId visited = kNoFile;
  for (const Impl::Hit& hit : hits) {
    if (only_certain && hit.location.certainty != Certainty::kCertain) {
      const SourceFile* source = hit.occurrence == kNoIndex ? nullptr : in.Get(hit.file);
      // What is handed on by keyword fails without it.
      if (source == nullptr || source->bindings.occurrences[hit.occurrence].role != NameRole::kKeyword) continue;
      rename.problem = "'" + std::string(old_name) + "' may be given by keyword in " + source->path + ", at line " +
                       std::to_string(source->PlaceOf(hit.location.begin).line);
      rename.edits.clear();
      return rename;
    }
    if (!in.IsProject(hit.file) || hit.location.role == "module") continue;
    if (visited != hit.file) visit.emplace(in, hit.file);
    visited = hit.file;
    const SourceFile* source = visit->file;
    const Text there(source->text().data() + hit.location.begin, hit.location.end - hit.location.begin);
    if (there != old_name) continue;
    // A name that the scope has already would be taken for this one.
    if (hit.occurrence != kNoIndex && source->bindings.occurrences[hit.occurrence].has_symbol) {
      const uint32_t scope = source->bindings.ScopeOf(source->bindings.occurrences[hit.occurrence]);
      const uint32_t variable = source->bindings.VariableOf(source->bindings.occurrences[hit.occurrence]);
      const uint32_t owner = source->bindings.symbols[variable].scope;
      for (const uint32_t at : {scope, owner}) {
        for (uint32_t symbol = source->bindings.scopes[at].first_symbol; symbol != kNoIndex;
             symbol = source->bindings.symbols[symbol].next) {
          if (source->bindings.texts[source->bindings.symbols[symbol].name] != name) continue;
          const Position place = source->PlaceOf(hit.location.begin);
          rename.problem = "'" + std::string(name) + "' means something else already in " + source->path +
                           ", at line " + std::to_string(place.line);
          rename.edits.clear();
          return rename;
        }
      }
    }
    rename.edits.push_back({hit.file, hit.location.begin, hit.location.end, std::string(name)});
  }
  std::ranges::sort(rename.edits, [&](const TextEdit& a, const TextEdit& b) {
    if (a.file != b.file) return in.files.PathOf(a.file) < in.files.PathOf(b.file);
    return a.begin < b.begin;
  });
  const auto is_same = [](const TextEdit& a, const TextEdit& b) { return a.file == b.file && a.begin == b.begin; };
  rename.edits.erase(std::unique(rename.edits.begin(), rename.edits.end(), is_same), rename.edits.end());
  if (rename.edits.empty()) rename.problem = "nothing that is certain is to be renamed";
  return rename;
}

}  // namespace quillet
