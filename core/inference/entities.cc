// What the name of an occurrence stands for.
#include <algorithm>

#include "inference/inference.h"

namespace quillet {

// Of what binds a variable in its file; an import that is never reached counts where it is `asked` about.
Inference::BoundEntities Inference::FindEntitiesOfVariable(const SourceFile& file, uint32_t variable, uint32_t asked) {
  BoundEntities result;
  const auto add = [&](const Entity& entity) {
    if (std::ranges::find(result.found, entity) == result.found.end()) result.found.push_back(entity);
  };
  bool has_own = false;
  for (const uint32_t i : file.occurrences().Of(variable)) {
    const Occurrence& other = file.bindings.occurrences[i];
    if (!other.binds()) continue;
    result.is_bound = true;
    if (other.kind != NameKind::kImport) {
      has_own = true;
      continue;
    }
    if (!IsReachable(file, file.syntax.StatementAt(other.begin)) && i != asked) continue;
    const Entities imported = EntitiesOfImport(file, other.begin);
    if (imported.found.empty()) has_own = true;
    for (const Entity& entity : imported.found) add(entity);
    result.doubt |= imported.doubt;
  }
  if (has_own) add(EntityOfVariable(file, variable));
  return result;
}

Entities Inference::EntitiesOf(const SourceFile& file, uint32_t index) {
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const FileSyntax& syntax = file.syntax;
  const Text name = file.bindings.TextOf(occurrence);
  Entities result;
  const auto add = [&](const Entity& entity) {
    if (std::ranges::find(result.found, entity) == result.found.end()) result.found.push_back(entity);
  };
  const auto add_all = [&](const Entities& others) {
    for (const Entity& entity : others.found) add(entity);
    result.doubt |= others.doubt;
  };
  const uint32_t variable = file.bindings.VariableOf(occurrence);
  if (variable != kNoIndex) {
    const Text plain = file.bindings.texts[file.bindings.symbols[variable].name];
    const bool is_left_out =
        occurrence.kind == NameKind::kImport && !IsReachable(file, syntax.StatementAt(occurrence.begin));
    // What has many names is found once for all of them.
    static constexpr size_t kMany = 64;
    bool is_bound = false;
    if (file.occurrences().Of(variable).size() < kMany) {
      const BoundEntities found = FindEntitiesOfVariable(file, variable, is_left_out ? index : kNoIndex);
      is_bound = found.is_bound;
      add_all(found);
    } else {
      const BoundEntities& found =
          entities_.Get(file.id, variable, [&] { return FindEntitiesOfVariable(file, variable, kNoIndex); });
      is_bound = found.is_bound;
      add_all(found);
      if (is_left_out) add_all(EntitiesOfImport(file, occurrence.begin));
    }
    if (is_bound) return result;
    // Nothing in the file binds it.
    const ModuleId own = NamesOfModule(file).stars.empty() ? kNoModule : modules_.OfFile(file.id);
    if (own != kNoModule) add_all(EntitiesInModule(own, plain));
    if (result.found.empty()) add_all(EntitiesOfBuiltin(plain));
    if (result.found.empty()) add(EntityOfVariable(file, variable));
    return result;
  }
  // A path of an import, or a name that is imported from it.
  if (occurrence.role == NameRole::kImport) {
    add_all(EntitiesOfImport(file, occurrence.begin));
    return result;
  }
  const ExprId named = syntax.NamedAt(occurrence.begin);
  if (occurrence.role == NameRole::kKeyword) {
    if (named == kNoExpr || syntax[named].kind != ExprKind::kKeyword) return result;
    const ExprId call = syntax[named].parent;
    if (call == kNoExpr) return result;  // of a class: `metaclass=`
    if (syntax[call].kind == ExprKind::kPatternClass) {
      const Value instance = Caught(ValueOf(file.id, syntax.ChildOf(call, 0)));
      for (const Member& member : MembersOf(instance, name, result.doubt)) add(EntityOfMember(member, name));
      return result;
    }
    if (syntax[call].kind != ExprKind::kCall) return result;
    const Value callee = ValueOf(file.id, syntax.ChildOf(call, 0));
    result.doubt |= callee.doubt;
    const auto add_parameter = [&](FunctionId function) {
      const FunctionInfo info = functions_[function];
      const SourceFile* other = FileOf(info.file);
      for (const ExprId parameter : ParametersOf(info)) {
        if (other->syntax.NameOf(parameter) != name) continue;
        const uint32_t at = other->OccurrenceBeginningAt(other->syntax[parameter].name_begin);
        if (at == kNoIndex) continue;
        const uint32_t symbol = other->bindings.VariableOf(other->bindings.occurrences[at]);
        if (symbol != kNoIndex) add({Entity::kVariable, info.file, symbol});
      }
    };
    for (const TypeId id : types_.CopyOf(callee.set)) {
      const Type t = types_[id];
      if (t.kind == TypeKind::kFunction) add_parameter(t.a);
      if (t.kind == TypeKind::kClass) {
        const ClassInfo& info = MembersOf(t.a);
        bool is_field = false;
        if (info.is_dataclass || info.is_named_tuple || info.is_typed_dict)
          for (const MadeField& field : info.fields) is_field = is_field || field.name == name;
        if (is_field) {
          if (const auto member = FindMember(t.a, name)) add(EntityOfMember(*member, name));
          continue;
        }
        for (const Text constructor : {Text("__init__"), Text("__new__")}) {
          const auto member = FindMember(t.a, constructor);
          if (!member || member->owner == ClassNamed("builtins", "object")) continue;
          for (const TypeId function : types_.CopyOf(RawValueOfMember(*member, constructor).set))
            if (types_[function].kind == TypeKind::kFunction) add_parameter(types_[function].a);
          break;
        }
      }
      if (t.kind == TypeKind::kInstance) {
        if (const auto member = FindMember(t.a, "__call__"))
          for (const TypeId function : types_.CopyOf(RawValueOfMember(*member, "__call__").set))
            if (types_[function].kind == TypeKind::kFunction) add_parameter(types_[function].a);
      }
    }
    if (result.found.empty()) {
      // Handed on to a function that is given as well: `assertRaises(E, f, x=1)`, `partial(f, x=1)`.
      result.doubt |= Value::kOpen;
      for (const ExprId argument : syntax.ChildrenOf(call).subspan(1)) {
        const ExprKind kind = syntax[argument].kind;
        if (kind != ExprKind::kName && kind != ExprKind::kAttribute) continue;
        for (const TypeId id : types_.CopyOf(ValueOf(file.id, argument).set))
          if (types_[id].kind == TypeKind::kFunction) add_parameter(types_[id].a);
      }
    }
    return result;
  }
  if (named == kNoExpr || syntax[named].kind != ExprKind::kAttribute) return result;
  const Value receiver = ValueOf(file.id, syntax.ChildOf(named, 0));
  result.doubt |= receiver.doubt;
  uint8_t doubt = 0;
  for (const Member& member : MembersOf(receiver, name, doubt)) add(EntityOfMember(member, name));
  result.doubt |= doubt;
  for (const TypeId id : types_.CopyOf(receiver.set)) {
    if (types_[id].kind == TypeKind::kModule) add_all(EntitiesInModule(types_[id].a, name));
  }
  if (result.found.empty()) result.doubt |= Value::kOpen;
  return result;
}

}  // namespace quillet
