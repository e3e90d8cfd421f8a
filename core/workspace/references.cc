// Uses of a name, everywhere.
#include <algorithm>
#include <array>
#include <optional>
#include <unordered_map>

#include "program/name_imports.h"
#include "program/two_threads.h"
#include "tokens/byte_scan.h"
#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

// Whether something in a text may be given under a name, as in `f(name=1)`.
bool MayHoldKeyword(Text text, Text name) {
  constexpr Text kBlanks = " \t\f\r\n\\";
  // What is not ASCII may be spelled in other ways.
  if (std::ranges::any_of(name, [](char c) { return static_cast<unsigned char>(c) >= 0x80; })) return true;
  for (size_t at = 0; (at = text.find(name, at)) != Text::npos; at += name.size()) {
    const size_t behind = text.find_first_not_of(kBlanks, at + name.size());
    if (behind == Text::npos) return false;
    // Nobody knows how far a comment goes.
    const bool is_given = text[behind] == '=' ? !text.substr(behind + 1).starts_with('=') : text[behind] == '#';
    if (is_given && (at == 0 || !IsAsciiIdentifierByte(text[at - 1]))) return true;
  }
  return false;
}

}  // namespace

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
      // What methods of both classes give their instances is one attribute; what a class defines anew is another, and
      // so is a private name, which is of the class that it stands in.
      const Text name = inference.NameOfNumber(entity.b);
      if (IsPrivateName(name)) continue;
      const auto is_written = [&](ClassId cls) {
        const ClassInfo& info = inference.MembersOf(cls);
        return !info.symbols.contains(name) && info.self_attributes.contains(name);
      };
      if (is_written(entity.a) && is_written(target.a)) meet(CertaintyOf(use.doubt));
    }
  }
  return has_met;
}

// Whether all is known of what an attribute is taken from: what has no such attribute then is not meant, unless classes
// below have it. `classes` gets those of the project that lack it.
bool Workspace::Impl::IsReceiverKnown(const SourceFile& file, const Occurrence& occurrence,
                                      std::vector<ClassId>* classes) {
  const ExprId named = file.syntax.NamedAt(occurrence.begin);
  if (named == kNoExpr || file.syntax[named].kind != ExprKind::kAttribute) return false;
  const Value receiver = inference.ValueOf(file.id, file.syntax.ChildOf(named, 0));
  if (!receiver.IsKnown() || receiver.doubt != 0) return false;
  for (const TypeId type : inference.types().CopyOf(receiver.set)) {
    const Type t = inference.types()[type];
    const ClassId cls = t.kind == TypeKind::kClass ? t.a : inference.ClassOfType(type);
    if (cls == kNoId || inference.InfoOf(cls).open_from != SIZE_MAX || inference.FindMember(cls, "__getattr__"))
      return false;
    if (classes != nullptr && IsProject(inference.InfoOf(cls).file)) classes->push_back(cls);
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

bool Workspace::Impl::IsParameter(const Entity& entity) {
  const SourceFile* owner = entity.kind == Entity::kVariable ? Get(entity.a) : nullptr;
  return owner != nullptr && (owner->bindings.symbols[entity.b].uses & NameSymbol::kParameter) != 0;
}

void Workspace::Impl::LeaveOutFilesWithoutKeyword(std::vector<FileId>& candidates, Text name,
                                                  const std::vector<Entity>& parameters) {
  static constexpr size_t kFilesWorthIt = 32;
  std::vector<uint8_t> is_kept(candidates.size());
  std::array<std::string, 2> memories;
  ForEachByThreads(candidates.size(), kFilesWorthIt, memories, [&](size_t i, std::string& memory) {
    const bool is_owner =
        std::ranges::any_of(parameters, [&](const Entity& entity) { return entity.a == candidates[i]; });
    is_kept[i] = is_owner || MayHoldKeyword(files.SourceOf(candidates[i], memory), name);
  });
  size_t kept = 0;
  for (size_t i = 0; i < candidates.size(); ++i)
    if (is_kept[i] != 0) candidates[kept++] = candidates[i];
  candidates.resize(kept);
}

std::vector<Workspace::Impl::Hit> Workspace::Impl::Uses(const SourceFile& file, uint32_t index, bool everywhere,
                                                        Family* family) {
  std::vector<Hit> hits;
  const Occurrence occurrence = file.bindings.occurrences[index];
  const FileId own = file.id;
  const std::string name(file.bindings.TextOf(occurrence));
  const auto find_wanted = [&] {
    Entities found = Meant(*Get(own), index);
    if (found.found.empty()) return found;
    AddOtherSides(found);
    if (family != nullptr)
      for (const KeptEntity& kept : family->members) AddNew(found.found, EntityOf(kept, name));
    return found;
  };
  Entities wanted = find_wanted();
  if (wanted.found.empty()) {
    // An attribute of what is not known: every one of its name.
    if (!occurrence.is_attribute) return hits;
    if (IsReceiverKnown(file, occurrence)) {
      hits.push_back({AtOccurrence(file, index, Certainty::kCertain), file.id, index});
      return hits;
    }
  }
  const bool is_by_name = wanted.found.empty();
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
    const bool is_parameter = IsParameter(entity);
    if (entity.a != file.id ||
        (kind != NameScopeKind::kFunction && kind != NameScopeKind::kLambda && kind != NameScopeKind::kComprehension) ||
        is_parameter)
      is_local = false;
  }
  const bool are_parameters =
      !is_by_name && std::ranges::all_of(wanted.found, [this](const Entity& entity) { return IsParameter(entity); });
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
    if (are_parameters) LeaveOutFilesWithoutKeyword(candidates, name, wanted.found);
  }
  for (const Entity& entity : wanted.found) {
    if (entity.kind != Entity::kModule) continue;
    Location location;
    location.file = modules[entity.a].file != kNoFile ? modules[entity.a].file : modules[entity.a].stub;
    location.role = location.kind = "module";
    if (location.file != kNoFile) hits.push_back({location, location.file, kNoIndex});
  }
  // Strings that say the attribute: in `__slots__`, and in the call that makes a class.
  for (const Entity& entity : wanted.found) {
    if (entity.kind != Entity::kMember) continue;
    const ClassInfo& info = inference.MembersOf(entity.a);
    const bool has_slots = info.symbols.contains("__slots__");
    const SourceFile* source = has_slots || info.call != kNoExpr ? Get(info.file) : nullptr;
    if (source == nullptr || (!everywhere && info.file != file.id)) continue;
    for (const MadeField& slot : has_slots ? inference.SlotsOf(*source, info.stmt) : info.fields) {
      const bool is_spelled = source->text().substr(slot.offset, name.size()) == Text(name);
      if (slot.name != name || !is_spelled || source->OccurrenceBeginningAt(slot.offset) != kNoIndex) continue;
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
      wanted = find_wanted();  // classes have other numbers now
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
    // Parameters are only given something there.
    const bool is_elsewhere =
        are_parameters && std::ranges::none_of(wanted.found, [id](const Entity& entity) { return entity.a == id; });
    for (uint32_t i = 0; i < bindings.occurrences.size(); ++i) {
      const Occurrence& other = bindings.occurrences[i];
      if (other.text != number || (is_elsewhere && other.role != NameRole::kKeyword)) continue;
      inference.BeginPart();
      const uint32_t variable = bindings.VariableOf(other);
      Certainty certainty = Certainty::kCertain;
      bool meets = false;
      if (has_member && variable != kNoIndex && other.binds()) {
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
          const size_t count = use.found.size();
          use.found.push_back({Entity::kVariable, id, variable});
          meets = Meets(use, wanted.found, certainty);
          use.found.resize(count);
          if (meets && family != nullptr) AddBeside(*source, i, use, wanted.found, *family);
          variables.emplace(variable, Known{meets, certainty});
        }
      } else {
        const Entities use = inference.EntitiesOf(*source, i);
        meets = Meets(use, wanted.found, certainty);
        if (meets && family != nullptr) AddBeside(*source, i, use, wanted.found, *family);
        if (!meets && use.found.empty() && has_member && other.is_attribute) {
          std::vector<ClassId> without;
          if (!IsReceiverKnown(*source, other, &without)) {
            unknown.push_back({AtOccurrence(*source, i, Certainty::kByName), id, i});
            continue;
          }
          // `self.total()` in a class that leaves it to those below.
          std::erase_if(without, [&](ClassId cls) {
            return std::ranges::none_of(wanted.found, [&](const Entity& entity) {
              return entity.kind == Entity::kMember && inference.IsSubclass(entity.a, cls);
            });
          });
          if (without.empty()) continue;
          hits.push_back({AtOccurrence(*source, i, Certainty::kLikely), id, i, true});
          if (family == nullptr) continue;
          for (const ClassId cls : without)
            if (const auto kept = KeptOf({Entity::kMember, cls, 0})) AddNew(family->above, *kept);
          continue;
        }
      }
      const bool is_foreign = id != own && !IsProject(id) && !files.IsOpen(id);
      if (meets && (!is_foreign || other.binds() || (other.is_attribute && other.role == NameRole::kWrite)))
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

}  // namespace quillet
