// What renaming a name changes, so that the program goes on doing the same, or why it cannot be done.
//
// With a method go those that override it and those that it overrides, and with anything what a place certainly means
// beside it: `x.total()` where `x` is one of two classes, a name that one of two modules gives. They are found round by
// round, until the uses of all of them mean nothing else. What of this is outside of the project cannot be renamed.
#include <algorithm>
#include <optional>
#include <set>

#include "workspace/workspace_impl.h"

namespace quillet {

std::optional<Workspace::Impl::KeptEntity> Workspace::Impl::KeptOf(const Entity& entity) {
  if (entity.kind == Entity::kVariable) return KeptEntity{entity.kind, entity.a, entity.b};
  if (entity.kind == Entity::kModule) return std::nullopt;
  const ClassInfo& info = inference.InfoOf(entity.a);
  if (info.stmt == kModuleStmt) return std::nullopt;
  return KeptEntity{entity.kind, info.file, info.stmt};
}

Entity Workspace::Impl::EntityOf(const KeptEntity& kept, Text name) {
  if (kept.kind == Entity::kVariable) return {kept.kind, kept.file, kept.at};
  return {kept.kind, inference.ClassOfStmt(kept.file, kept.at), inference.NumberOfName(name)};
}

// What a use that certainly means one of those wanted means as well.
void Workspace::Impl::AddBeside(const SourceFile& file, uint32_t occurrence, const Entities& use,
                                const std::vector<Entity>& wanted, Family& family) {
  if (use.doubt != 0) return;
  const Occurrence& there = file.bindings.occurrences[occurrence];
  const Text name = file.bindings.TextOf(there);
  for (const Entity& entity : use.found) {
    if (std::ranges::find(wanted, entity) != wanted.end()) continue;
    if (entity.kind == Entity::kVariable) {
      // Under another name it was imported, and keeps that.
      const SourceFile* owner = Get(entity.a);
      if (owner == nullptr || owner->bindings.texts[owner->bindings.symbols[entity.b].name] != name) continue;
    }
    const std::optional<KeptEntity> kept = KeptOf(entity);
    const auto is_same = [&](const Family::Beside& other) { return other.entity == entity && other.kept == kept; };
    if (std::ranges::none_of(family.beside, is_same)) family.beside.push_back({entity, kept, file.id, there.begin});
  }
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

// The project's classes that have an attribute of a name themselves.
std::vector<Workspace::Impl::KeptEntity> Workspace::Impl::ClassesWith(Text name) {
  std::vector<KeptEntity> found;
  const std::vector<FileId> candidates = project.WithWords({name});
  VisitAll visits(*this, candidates);
  for (size_t next = 0; next < candidates.size(); ++next) {
    if (IsMuchRemembered()) ForgetFound();
    const Visit visit = visits.At(next);
    if (visit.file == nullptr || NumberOfText(visit.file->bindings, name) == kNoIndex) continue;
    for (StmtId stmt = 1; stmt < visit.file->syntax.stmts.size(); ++stmt) {
      if (visit.file->syntax.stmt(stmt).kind != StmtKind::kClass) continue;
      inference.BeginPart();
      const ClassInfo& info = inference.MembersOf(inference.ClassOfStmt(visit.file->id, stmt));
      if (info.symbols.contains(name) || info.self_attributes.contains(name))
        found.push_back({Entity::kMember, visit.file->id, stmt});
    }
  }
  return found;
}

// Adds to classes those of the definers that are above or below one of them or below one of `above`, and so on.
void Workspace::Impl::AddRelated(const std::vector<KeptEntity>& definers, const std::vector<KeptEntity>& above,
                                 std::vector<KeptEntity>& classes) {
  const auto id_of = [&](const KeptEntity& kept) { return inference.ClassOfStmt(kept.file, kept.at); };
  std::vector<std::pair<KeptEntity, ClassId>> others;
  for (const KeptEntity& definer : definers)
    if (std::ranges::find(classes, definer) == classes.end()) others.emplace_back(definer, id_of(definer));
  const auto take = [&](ClassId cls, bool also_above) {
    std::erase_if(others, [&](const auto& other) {
      const bool is_related =
          inference.IsSubclass(other.second, cls) || (also_above && inference.IsSubclass(cls, other.second));
      if (is_related) classes.push_back(other.first);
      return is_related;
    });
  };
  for (const KeptEntity& user : above) take(id_of(user), false);
  for (size_t i = 0; i < classes.size(); ++i) take(id_of(classes[i]), true);
}

// Classes and all that derive from one of them, found by the names of their bases.
std::vector<Workspace::Impl::KeptEntity> Workspace::Impl::AllBelow(const std::vector<KeptEntity>& classes) {
  static constexpr size_t kMostFiles = 2000;
  std::vector<KeptEntity> found = classes;
  std::set<KeptEntity> known(classes.begin(), classes.end());
  std::set<FileId> looked_through;
  std::set<std::string> names;
  for (size_t i = 0; i < found.size(); ++i) {
    const SourceFile* file = Get(found[i].file);
    if (file == nullptr) continue;
    const std::string name(file->syntax.NameOf(file->syntax.stmt(found[i].at)));
    if (!names.insert(name).second) continue;
    std::vector<FileId> candidates = project.WithWords({name});
    std::erase_if(candidates, [&](FileId candidate) { return looked_through.contains(candidate); });
    VisitAll visits(*this, candidates);
    for (size_t next = 0; next < candidates.size(); ++next) {
      if (looked_through.size() >= kMostFiles) {
        is_bounded = true;
        return found;
      }
      if (IsMuchRemembered()) ForgetFound();
      const Visit visit = visits.At(next);
      looked_through.insert(candidates[next]);
      if (visit.file == nullptr) continue;
      for (StmtId stmt = 1; stmt < visit.file->syntax.stmts.size(); ++stmt) {
        if (visit.file->syntax.stmt(stmt).kind != StmtKind::kClass) continue;
        const KeptEntity kept{Entity::kMember, visit.file->id, stmt};
        if (known.contains(kept)) continue;
        inference.BeginPart();
        const ClassId cls = inference.ClassOfStmt(kept.file, stmt);
        const bool is_below = std::ranges::any_of(inference.InfoOf(cls).order, [&](const BaseClass& base) {
          const std::optional<KeptEntity> above = KeptOf({Entity::kMember, base.cls, 0});
          return above && std::ranges::find(classes, *above) != classes.end();
        });
        if (!is_below) continue;
        known.insert(kept);
        found.push_back(kept);
      }
    }
  }
  return found;
}

// Adds what overrides a member, and what it overrides; says why that cannot be renamed.
std::string Workspace::Impl::AddOverrides(const Entities& meant, Text name, Text new_name, Family& family) {
  std::vector<KeptEntity> classes;
  for (const KeptEntity& member : family.members)
    if (member.kind == Entity::kMember) classes.push_back(member);
  for (const Entity& entity : meant.found)
    if (const auto kept = KeptOf(entity); kept && entity.kind == Entity::kMember) AddNew(classes, *kept);
  if (classes.empty() || IsPrivateName(name)) return {};
  const std::vector<KeptEntity> definers = ClassesWith(name);
  std::vector<KeptEntity> below;
  for (bool has_grown = true; has_grown;) {
    has_grown = false;
    AddRelated(definers, family.above, classes);
    below = AllBelow(classes);
    // What derives from two that have nothing else in common makes them one.
    for (const KeptEntity& kept : below) {
      const std::vector<BaseClass> order = inference.InfoOf(inference.ClassOfStmt(kept.file, kept.at)).order;
      for (const BaseClass& base : order) {
        const std::optional<KeptEntity> above = KeptOf({Entity::kMember, base.cls, 0});
        if (!above || std::ranges::find(definers, *above) == definers.end() ||
            std::ranges::find(classes, *above) != classes.end())
          continue;
        classes.push_back(*above);
        has_grown = true;
      }
    }
  }
  for (const KeptEntity& kept : below) {
    if (IsMuchRemembered()) ForgetFound();
    const std::vector<BaseClass> order = inference.InfoOf(inference.ClassOfStmt(kept.file, kept.at)).order;
    for (const BaseClass& base : order) {
      const ClassInfo& info = inference.MembersOf(base.cls);
      const auto has = [&](Text attribute) {
        return info.symbols.contains(attribute) || info.self_attributes.contains(attribute);
      };
      // What a library calls by its name keeps it.
      if (!IsProject(info.file) && has(name))
        return "'" + std::string(name) + "' overrides what '" + inference.QualifiedName(base.cls) +
               "' defines outside of the project";
      if (has(new_name))
        return "'" + std::string(new_name) + "' means something else already in '" + inference.QualifiedName(base.cls) +
               "'";
    }
  }
  for (const KeptEntity& kept : classes) AddNew(family.members, kept);
  return {};
}

// Adds what certain uses mean beside the family, and forgets it; says why that cannot be renamed.
std::string Workspace::Impl::AddOthersMeant(Text name, Family& family, bool& has_grown) {
  for (const Family::Beside& beside : std::exchange(family.beside, {})) {
    if (beside.kept && std::ranges::find(family.members, *beside.kept) != family.members.end()) continue;
    if (!beside.kept || !IsProject(beside.kept->file)) {
      const SourceFile* source = Get(beside.file);
      if (source == nullptr) continue;
      return "'" + std::string(name) + "' is something else as well, which cannot be renamed, in " + source->path +
             ", at line " + std::to_string(source->PlaceOf(beside.offset).line);
    }
    family.members.push_back(*beside.kept);
    has_grown = true;
  }
  return {};
}

// Adds the parameters that overriding and overridden methods call the same. Who makes an object knows its class, so
// those of constructors have nothing to do with each other.
void Workspace::Impl::AddParametersOfOverrides(const Entities& meant, Text name, Family& family) {
  struct Method {
    std::string name;
    KeptEntity cls;
  };
  std::vector<Method> methods;
  const auto add_method = [&](FileId file, uint32_t symbol) {
    const SourceFile* owner = Get(file);
    if (owner == nullptr || (owner->bindings.symbols[symbol].uses & NameSymbol::kParameter) == 0) return;
    const FunctionId function = inference.FunctionOfScope(*owner, owner->bindings.symbols[symbol].scope);
    if (function == kNoId) return;
    const FunctionInfo& info = inference.function(function);
    if (info.cls == kNoId || info.stmt == kModuleStmt) return;
    const Text method = owner->syntax.NameOf(owner->syntax.stmt(info.stmt));
    const std::optional<KeptEntity> cls = KeptOf({Entity::kMember, info.cls, 0});
    if (cls && method != "__init__" && method != "__new__" && !IsPrivateName(method))
      methods.push_back({std::string(method), *cls});
  };
  for (const Entity& entity : meant.found)
    if (entity.kind == Entity::kVariable) add_method(entity.a, entity.b);
  for (const KeptEntity& member : family.members)
    if (member.kind == Entity::kVariable) add_method(member.file, member.at);
  for (const Method& method : methods) {
    std::vector<KeptEntity> classes{method.cls};
    AddRelated(ClassesWith(method.name), {}, classes);
    for (const KeptEntity& cls : classes) {
      const SourceFile* file = Get(cls.file);
      if (file == nullptr) continue;
      const ClassInfo& info = inference.MembersOf(inference.ClassOfStmt(cls.file, cls.at));
      const auto at = info.symbols.find(Text(method.name));
      if (at == info.symbols.end()) continue;
      for (const Binding& binding : inference.DefinitionsOf(*file, at->second)) {
        const StmtId stmt = file->syntax.StatementNamedAt(binding.offset);
        if (file->syntax.stmt(stmt).kind != StmtKind::kDef) continue;
        for (const ExprId parameter :
             inference.ParametersOf(inference.function(inference.FunctionOfStmt(cls.file, stmt)))) {
          if (file->syntax.NameOf(parameter) != name) continue;
          const uint32_t occurrence = file->OccurrenceBeginningAt(file->syntax[parameter].name_begin);
          if (occurrence == kNoIndex) continue;
          const uint32_t symbol = file->bindings.VariableOf(file->bindings.occurrences[occurrence]);
          if (symbol != kNoIndex) AddNew(family.members, KeptEntity{Entity::kVariable, cls.file, symbol});
        }
      }
    }
  }
}

// Why what a name means cannot be renamed; empty where it can.
std::string Workspace::Impl::WhyNot(const Entities& meant, Text name) {
  const std::string quoted = "'" + std::string(name) + "'";
  if (meant.found.empty()) return "nothing is known of what " + quoted + " stands for here";
  if (name.starts_with("__") && name.ends_with("__")) return quoted + " is a name that the language uses";
  bool is_bound = false;
  for (const Entity& entity : meant.found) {
    if (entity.kind == Entity::kModule) return quoted + " is a module: rename its file";
    for (const Binding& binding : inference.BindingsOf(entity)) {
      is_bound = true;
      if (!IsProject(binding.file))
        return quoted + " is defined outside of the project, in " + files.PathOf(binding.file);
    }
  }
  return is_bound ? std::string() : "nothing is known of what " + quoted + " stands for here";
}

// Where a name means something in the scope of a symbol's variable that the variable would take, or that would take it;
// kNoIndex where it does not.
uint32_t Workspace::Impl::TakenAt(const SourceFile& file, uint32_t symbol, Text name) {
  const Bindings& bindings = file.bindings;
  if (NumberOfText(bindings, name) == kNoIndex) return kNoIndex;
  const uint32_t owner = bindings.symbols[bindings.symbols[symbol].variable].scope;
  const auto is_within = [&](uint32_t scope, uint32_t around) {
    while (scope != kNoIndex && scope > around) scope = bindings.scopes[scope].parent;
    return scope == around;
  };
  const bool is_of_class = bindings.scopes[owner].kind == NameScopeKind::kClass;
  for (uint32_t other = 0; other < bindings.symbols.size(); ++other) {
    const NameSymbol& met = bindings.symbols[other];
    if (bindings.texts[met.name] != name || !is_within(met.scope, owner)) continue;
    // What a class has is not seen from the scopes in it.
    if (is_of_class && met.scope != owner) continue;
    const uint32_t its_owner = bindings.symbols[met.variable].scope;
    const bool is_inside = its_owner != owner && is_within(its_owner, owner);
    if (is_inside) {
      // It hides the new name from what stands in its scope.
      if (!is_within(bindings.symbols[symbol].scope, its_owner)) continue;
      if (bindings.scopes[its_owner].kind == NameScopeKind::kClass && its_owner != bindings.symbols[symbol].scope)
        continue;
    } else if (met.scope != owner && its_owner != owner && met.resolution == NameSymbol::Resolution::kExplicitGlobal) {
      continue;
    }
    for (const Occurrence& occurrence : bindings.occurrences)
      if (occurrence.has_symbol && occurrence.place == other) return occurrence.begin;
    return bindings.scopes[met.scope].begin;
  }
  return kNoIndex;
}

Rename Workspace::RenameTo(FileId id, uint32_t offset, Text name, bool only_certain) {
  static constexpr int kMostRounds = 16;
  Impl& in = *impl_;
  in.BeginAnew();
  Rename rename;
  const auto refuse = [&](std::string why) {
    rename.edits.clear();
    rename.problem = std::move(why);
    return rename;
  };
  const SourceFile* file = in.Get(id);
  const uint32_t index = file == nullptr ? kNoIndex : in.OccurrenceAt(*file, offset);
  if (index == kNoIndex) return refuse("there is no name here");
  const bool is_identifier = !name.empty() && CodeOfText(name) == tok::NAME;
  if (!is_identifier) return refuse("'" + std::string(name) + "' is no name that code can use");
  const std::string old_name(file->bindings.TextOf(file->bindings.occurrences[index]));
  if (old_name == name) return refuse("'" + old_name + "' has this name already");
  const auto meant_here = [&] {
    Entities meant = in.Meant(*in.Get(id), index);
    in.AddOtherSides(meant);
    return meant;
  };
  if (std::string why = in.WhyNot(meant_here(), old_name); !why.empty()) return refuse(std::move(why));

  Impl::Family family;
  std::vector<Impl::Hit> hits;
  bool has_parameters = false;
  bool has_grown = true;
  for (int round = 0; has_grown && round < kMostRounds; ++round) {
    if (std::string why = in.AddOverrides(meant_here(), old_name, name, family); !why.empty())
      return refuse(std::move(why));
    const size_t count = family.members.size(), above = family.above.size();
    hits = in.Uses(*in.Get(id), index, true, &family);
    has_grown = family.above.size() > above;
    std::string why = in.AddOthersMeant(old_name, family, has_grown);
    if (!why.empty() && only_certain) return refuse(std::move(why));
    const auto is_keyword = [&](const Impl::Hit& hit) {
      const SourceFile* source = hit.occurrence == kNoIndex ? nullptr : in.Get(hit.file);
      return source != nullptr && source->bindings.occurrences[hit.occurrence].role == NameRole::kKeyword;
    };
    if (!has_parameters && std::ranges::any_of(hits, is_keyword)) {
      has_parameters = true;
      in.AddParametersOfOverrides(meant_here(), old_name, family);
      has_grown |= family.members.size() > count;
    }
  }
  if (has_grown) in.is_bounded = true;
  Entities all = meant_here();
  for (const Impl::KeptEntity& kept : family.members) AddNew(all.found, in.EntityOf(kept, old_name));
  if (std::string why = in.WhyNot(all, old_name); !why.empty()) return refuse(std::move(why));
  if (only_certain) {
    for (const Entity& entity : all.found) {
      const Binding call = in.CallWithUnseenKeywords(entity);
      const SourceFile* source = call.file == kNoFile ? nullptr : in.Get(call.file);
      if (source == nullptr) continue;
      return refuse("'" + old_name + "' may be given by '**' in " + source->path + ", at line " +
                    std::to_string(source->PlaceOf(call.offset).line));
    }
  }
  std::optional<Impl::Visit> visit;  // of the file of the hits that follow each other
  FileId visited = kNoFile;
  std::set<std::pair<FileId, uint32_t>> symbols;  // of which it was looked where they stand
  for (const Impl::Hit& hit : hits) {
    if (only_certain && hit.location.certainty != Certainty::kCertain && !hit.is_below) {
      const SourceFile* source = hit.occurrence == kNoIndex ? nullptr : in.Get(hit.file);
      // What is handed on by keyword fails without it.
      if (source == nullptr || source->bindings.occurrences[hit.occurrence].role != NameRole::kKeyword) continue;
      return refuse("'" + old_name + "' may be given by keyword in " + source->path + ", at line " +
                    std::to_string(source->PlaceOf(hit.location.begin).line));
    }
    if (!in.IsProject(hit.file) || hit.location.role == "module") continue;
    if (visited != hit.file) visit.emplace(in, hit.file);
    visited = hit.file;
    const SourceFile* source = visit->file;
    const Text there(source->text().data() + hit.location.begin, hit.location.end - hit.location.begin);
    if (there != old_name) continue;
    if (hit.occurrence != kNoIndex && source->bindings.occurrences[hit.occurrence].has_symbol) {
      const uint32_t symbol = source->bindings.occurrences[hit.occurrence].place;
      const bool is_new = symbols.emplace(hit.file, symbol).second;
      const uint32_t taken = is_new ? in.TakenAt(*source, symbol, name) : kNoIndex;
      if (taken != kNoIndex)
        return refuse("'" + std::string(name) + "' means something else already in " + source->path + ", at line " +
                      std::to_string(source->PlaceOf(taken).line));
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
