// What stands behind a dot.
#include <algorithm>
#include <array>

#include "inference/inference.h"

namespace quillet {

// Whether a class says what its member is: by a definition or an annotation, in its body or in a method.
bool Inference::IsDeclared(const Member& member) {
  if (member.field != nullptr) return true;
  const SourceFile* file = FileOf(classes_[member.owner].file);
  if (file == nullptr) return false;
  const auto is_annotated = [&](uint32_t offset) {
    const Stmt& stmt = file->syntax.stmt(file->syntax.StatementAt(offset));
    return stmt.hint != kNoExpr && (stmt.kind == StmtKind::kAnnotated || stmt.kind == StmtKind::kAssign);
  };
  if (member.symbol != kNoIndex) {
    for (const uint32_t i : file->occurrences().Of(member.symbol)) {
      const Occurrence& occurrence = file->bindings.occurrences[i];
      if (occurrence.kind == NameKind::kFunction || occurrence.kind == NameKind::kClass) return true;
      if (occurrence.kind == NameKind::kVariable && is_annotated(occurrence.begin)) return true;
    }
  }
  return member.self_attributes != nullptr && std::ranges::any_of(*member.self_attributes, is_annotated);
}

const Member* Inference::FindMember(ClassId cls, Text name, bool on_class) {
  if (cls == kNoId) return nullptr;
  const uint64_t key = (uint64_t{cls} << 32 | NumberOfName(name)) * 2 + (on_class ? 2 : 1);
  if (const uint32_t* known = members_by_class_.Find(key)) return *known == 0 ? nullptr : &members_[*known - 1];
  std::optional<Member> found = LookUpMember(cls, name, on_class);
  if (found) members_.push_back(std::move(*found));
  const bool is_final = classes_[cls].has_bases;  // not while they are being found
  if (is_final) members_by_class_.Put(key, found ? static_cast<uint32_t>(members_.size()) : 0);
  return found ? &members_.back() : nullptr;
}

// What a class only assigns, and a class above it declares, is the attribute of that one.
std::optional<Member> Inference::LookUpMember(ClassId cls, Text name, bool on_class) {
  InfoOf(cls);
  const size_t size = classes_[cls].order.size();
  std::optional<Member> assigned;
  for (size_t i = 0; i < size; ++i) {
    const ClassId owner = classes_[cls].order[i].cls;
    ClassInfo& info = MembersOf(owner);
    Member member;
    if (const auto at = info.symbols.find(name); at != info.symbols.end()) member.symbol = at->second;
    const auto written = info.self_attributes.find(name);
    if (written != info.self_attributes.end() && (!on_class || info.class_written.contains(name)))
      member.self_attributes = &written->second;
    if (info.call != kNoExpr) {
      for (const MadeField& field : info.fields)
        if (field.name == name) member.field = &field;
    }
    if (member.symbol == kNoIndex && member.self_attributes == nullptr && member.field == nullptr) continue;
    member.owner = owner;
    member.args = classes_[cls].order[i].args;
    member.is_behind_open_base = i >= classes_[cls].open_from;
    if (assigned && member.is_behind_open_base) break;
    if (info.is_enum || IsDeclared(member)) return member;
    if (!assigned) assigned = std::move(member);
  }
  if (assigned || name.size() < 3 || name[2] != '_') return assigned;
  // What runs a generator or a coroutine is of a class of its own, which its type does not say.
  static constexpr std::array<std::array<Text, 3>, 3> kRunning{{{"gi_", "Generator", "GeneratorType"},
                                                                {"cr_", "Coroutine", "CoroutineType"},
                                                                {"ag_", "AsyncGenerator", "AsyncGeneratorType"}}};
  for (const auto& [prefix, type, running] : kRunning) {
    if (!name.starts_with(prefix) || classes_[cls].name != type || ClassNamed("typing", type) != cls) continue;
    const ClassId itself = ClassNamed("types", running);
    assigned = itself == kNoId ? std::nullopt : LookUpMember(itself, name, on_class);
    if (assigned) assigned->args = classes_[cls].order.front().args;
  }
  return assigned;
}

std::vector<Member> Inference::MembersOf(Value receiver, Text name, uint8_t& doubt) {
  std::vector<Member> found;
  doubt = receiver.doubt;
  const auto add = [&](const Member* member) {
    if (member == nullptr) return false;
    if (member->is_behind_open_base) doubt |= Value::kOpen;
    found.push_back(*member);
    return true;
  };
  for (const TypeId id : types_.CopyOf(receiver.set)) {
    const Type t = types_[id];
    switch (t.kind) {
      case TypeKind::kClass:
        if (!add(FindMember(t.a, name, true))) add(FindMember(ClassOfType(id), name));
        break;
      case TypeKind::kSuper: {
        // Behind the class, in the order of the receiver's own.
        for (const TypeId self : types_.CopyOf(types_.ArgOf(id, 0))) {
          const ClassId cls = types_[self].kind == TypeKind::kClass ? types_[self].a : ClassOfType(self);
          if (cls == kNoId) continue;
          const std::vector<BaseClass> order = InfoOf(cls).order;
          bool is_behind = false;
          for (const BaseClass& entry : order) {
            if (is_behind && MembersOf(entry.cls).symbols.contains(Text(name))) {
              add(FindMember(entry.cls, name));
              break;
            }
            if (entry.cls == t.a) is_behind = true;
          }
          if (classes_[cls].is_open) doubt |= Value::kOpen;
        }
        break;
      }
      case TypeKind::kTypeForm:
        for (const Member& member : MembersOf(Value{types_.ArgOf(id, 0), 0}, name, doubt)) found.push_back(member);
        break;
      case TypeKind::kInstance: {
        // An instance of type[X] is a class.
        if (t.args_count == 1 && classes_[t.a].name == "type" && t.a == ClassNamed("builtins", "type")) {
          for (const TypeId inner : types_.CopyOf(types_.ArgOf(id, 0)))
            if (add(FindMember(ClassOfType(inner), name))) break;
        }
        add(FindMember(t.a, name));
        break;
      }
      case TypeKind::kTypeVar: {
        const SourceFile* file = FileOf(t.a);
        if (file == nullptr) break;
        const FileSyntax& syntax = file->syntax;
        ExprId bound = kNoExpr;
        if (syntax[t.b].kind == ExprKind::kTypeParameter) {
          bound = syntax.ChildOf(t.b, 0);
        } else {
          for (const ExprId argument : syntax.ChildrenOf(t.b))
            if (syntax[argument].kind == ExprKind::kKeyword && syntax.NameOf(argument) == "bound")
              bound = syntax.ChildOf(argument, 0);
        }
        if (bound == kNoExpr) break;
        uint8_t inner_doubt = 0;
        for (const Member& member : MembersOf(ValueOfHint(t.a, bound), name, inner_doubt)) found.push_back(member);
        break;
      }
      default:
        add(FindMember(ClassOfType(id), name));
        break;
    }
  }
  return found;
}

Entity Inference::EntityOfMember(const Member& member, Text name) {
  return {Entity::kMember, member.owner, NumberOfName(name)};
}

Value Inference::AttributeOf(Value receiver, Text name) {
  Value value{kNoTypes, receiver.doubt};
  for (const TypeId id : types_.CopyOf(receiver.set)) {
    const Value one = AttributeOfType(id, name);
    value.set = types_.Union(value.set, one.set);
    value.doubt |= one.IsKnown() || types_.SizeOf(receiver.set) == 1 ? one.doubt : 0;
  }
  if (!value.IsKnown()) value.doubt |= Value::kOpen;
  return value;
}

Value Inference::AttributeOfModule(ModuleId module, Text name) {
  const Entities entities = EntitiesInModule(module, name);
  Value value{kNoTypes, entities.doubt};
  for (const Entity& entity : entities.found) value = types_.Union(value, ValueOfEntity(entity));
  if (!entities.found.empty()) return value;
  if (name == "__name__" || name == "__file__" || name == "__doc__") return InstanceNamed("builtins", "str");
  const Entities fallback = EntitiesInModule(module, "__getattr__");
  if (!fallback.found.empty()) {
    std::vector<Argument> arguments;
    Value result = ResultOf(ValueOfEntity(fallback.found[0]), arguments);
    result.doubt |= Value::kOpen;
    return result;
  }
  const ClassId module_type = ClassNamed("types", "ModuleType");
  return module_type == kNoId || !name.starts_with("__") ? kUnknownValue
                                                         : AttributeOfType(InstanceOf(module_type), name);
}

Solution Inference::SolutionFor(const Member& member, TypeId receiver) {
  Solution solution;
  const ClassInfo& owner = classes_[member.owner];
  if (!owner.parameters.empty()) {
    Solution own;
    if (types_[receiver].kind == TypeKind::kTuple) {
      TypeSetId items = kNoTypes;
      for (size_t i = 0; i < types_[receiver].args_count; ++i) items = types_.Union(items, types_.ArgOf(receiver, i));
      const ClassId tuple = ClassNamed("builtins", "tuple");
      for (const TypeId parameter : InfoOf(tuple).parameters) own.emplace_back(parameter, items);
    } else if (types_[receiver].kind == TypeKind::kInstance || types_[receiver].kind == TypeKind::kClass) {
      const std::vector<TypeId> parameters = InfoOf(types_[receiver].a).parameters;
      for (size_t i = 0; i < parameters.size(); ++i)
        own.emplace_back(parameters[i], i < types_[receiver].args_count ? types_.ArgOf(receiver, i) : kNoTypes);
    }
    for (size_t i = 0; i < owner.parameters.size(); ++i) {
      const TypeSetId arg = i < member.args.size() ? member.args[i] : kNoTypes;
      solution.emplace_back(owner.parameters[i], Substitute({arg, 0}, own).Packed());
    }
  }
  solution.emplace_back(
      types_.Add(TypeKind::kSpecial, static_cast<uint32_t>(SpecialForm::kSelf)),
      types_.SetOf(types_[receiver].kind == TypeKind::kClass ? InstanceOf(types_[receiver].a) : receiver));
  return solution;
}

// A descriptor, bound to what it was looked up on.
Value Inference::Bound(Value value, TypeId receiver, bool on_class, ClassId owner) {
  Value bound{kNoTypes, value.doubt};
  const ClassId property = ClassNamed("builtins", "property");
  const auto itself = [&] {
    return types_[receiver].kind == TypeKind::kClass ? receiver : types_.Add(TypeKind::kClass, ClassOfType(receiver));
  };
  for (const TypeId id : types_.CopyOf(value.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kFunction && t.args_count == 0) {
      const FunctionInfo& info = functions_[t.a];
      if ((info.flags & kIsStatic) != 0 && info.cls != kNoId) {
        bound = types_.Union(bound, Just(id));
      } else if ((info.flags & kIsClassMethod) != 0) {
        bound = types_.Union(bound, Just(types_.Add(TypeKind::kFunction, t.a, t.b, {types_.SetOf(itself())})));
      } else if (on_class) {
        bound = types_.Union(bound, Just(id));
      } else {
        bound = types_.Union(bound, Just(types_.Add(TypeKind::kFunction, t.a, t.b, {types_.SetOf(receiver)})));
      }
      continue;
    }
    if (t.kind == TypeKind::kInstance) {
      if (IsSubclass(t.a, property)) {
        if (on_class) {
          bound = types_.Union(bound, Just(id));
          continue;
        }
        const Value getter = Bound({types_.ArgOf(id, 0), 0}, receiver, false, owner);
        std::vector<Argument> none;
        bound = types_.Union(bound, getter.IsKnown() ? ResultOf(getter, none) : kUnknownValue);
        continue;
      }
      if (t.args_count == 1 && t.a == ClassNamed("builtins", "staticmethod")) {
        bound = types_.Union(bound, Value{types_.ArgOf(id, 0), 0});
        continue;
      }
      if (t.args_count == 1 && t.a == ClassNamed("builtins", "classmethod")) {
        bound = types_.Union(bound, Bound({types_.ArgOf(id, 0), 0}, itself(), false, owner));
        continue;
      }
      const bool may_be_descriptor = property == kNoId || classes_[t.a].file != classes_[property].file;
      if (may_be_descriptor && FindMember(t.a, "__get__")) {
        bound = types_.Union(
            bound, CallMethod(Just(id), "__get__", {on_class ? NoneValue() : Just(receiver), Just(itself())}));
        continue;
      }
    }
    if (t.kind == TypeKind::kCallable && !on_class && t.b == 1 && t.args_count > 1) {
      // What a decorator made of a method: its first parameter is the receiver.
      std::vector<TypeSetId> args{types_.ArgOf(id, 0)};
      for (size_t i = 2; i < t.args_count; ++i) args.push_back(types_.ArgOf(id, i));
      bound = types_.Union(bound, Just(types_.Add(TypeKind::kCallable, 0, 1, args)));
      continue;
    }
    bound = types_.Union(bound, Just(id));
  }
  return bound;
}

Value Inference::ValueOfMember(const Member& member, Text name, TypeId receiver, bool on_class) {
  ClassInfo& owner = MembersOf(member.owner);
  const SourceFile* file = FileOf(owner.file);
  if (file == nullptr) return kUnknownValue;
  // What the library makes of a named tuple, as `_replace` does, may hold something else than that one.
  if (file->is_stub && types_[receiver].kind == TypeKind::kInstance && classes_[types_[receiver].a].is_named_tuple &&
      LiteralOf(types_[receiver]).starts_with('#')) {
    const std::vector<TypeSetId> args(types_.ArgsOf(receiver).begin(), types_.ArgsOf(receiver).end());
    receiver = InstanceOf(types_[receiver].a, args);
  }
  Value value{kNoTypes, static_cast<uint8_t>(member.is_behind_open_base ? Value::kOpen : 0)};
  if (member.field != nullptr) {
    if (owner.is_enum) return Just(InstanceOf(member.owner));
    const Value field = member.field->hint != kNoExpr    ? ValueOfHint(owner.file, member.field->hint)
                        : member.field->value != kNoExpr ? ValueOf(owner.file, member.field->value)
                                                         : kUnknownValue;
    if (owner.is_named_tuple && member.field->hint == kNoExpr && member.field->value == kNoExpr &&
        LiteralOf(types_[receiver]).starts_with('#'))
      for (const auto& [given_name, given] : EntriesOf(receiver))
        if (given_name == name) return types_.Union(value, given);
    return types_.Union(value, field);
  }
  bool is_declared = false, is_property = false;
  if (member.symbol != kNoIndex) {
    const Value raw = ValueOfVariable(*file, member.symbol, kNoFrame);
    // What a property is given is not what it gives.
    const ClassId property = ClassNamed("builtins", "property");
    for (const TypeId id : types_.CopyOf(raw.set))
      is_property = is_property || (types_[id].kind == TypeKind::kInstance && IsSubclass(types_[id].a, property));
    for (const uint32_t i : file->occurrences().Of(member.symbol)) {
      const Stmt& stmt = file->syntax.stmt(file->syntax.StatementAt(file->bindings.occurrences[i].begin));
      if (stmt.kind == StmtKind::kAnnotated) is_declared = raw.IsKnown();
    }
    if (owner.is_enum && !name.starts_with("_")) {
      // A plain value in the body of an enumeration is a member of it.
      bool is_member = !file->is_stub || !is_declared;
      for (const uint32_t i : file->occurrences().Of(member.symbol))
        if (file->bindings.occurrences[i].kind == NameKind::kFunction ||
            file->bindings.occurrences[i].kind == NameKind::kClass)
          is_member = false;
      if (is_member) {
        const ClassId cls = types_[receiver].kind == TypeKind::kClass ? types_[receiver].a : member.owner;
        return Just(types_.Add(TypeKind::kInstance, cls, LiteralNumber(name)));
      }
    }
    value = types_.Union(value, Bound(raw, receiver, on_class, member.owner));
  }
  if (member.self_attributes != nullptr && !is_declared && !is_property) {
    Value written;
    for (const uint32_t offset : *member.self_attributes) {
      const ExprId target = file->syntax.NamedAt(offset);
      if (target == kNoExpr) continue;
      const Stmt& stmt = file->syntax.stmt(file->syntax.StatementOf(target));
      const Value one = ValueOfBinding({owner.file, offset});
      if (stmt.kind == StmtKind::kAnnotated && one.IsKnown()) {
        written = one;
        break;
      }
      if (stmt.kind == StmtKind::kAugmentedAssign && written.IsKnown()) continue;
      written = types_.Union(written, one);
    }
    value = types_.Union(value, written);
  }
  // What a class above says of a name that this one gives nothing but None.
  if (!owner.parameters.empty() || member.owner != types_[receiver].a)
    value = Substitute(value, SolutionFor(member, receiver));
  else
    value = Substitute(
        value, {{types_.Add(TypeKind::kSpecial, static_cast<uint32_t>(SpecialForm::kSelf)), types_.SetOf(receiver)}});
  return value;
}

Value Inference::AttributeOfType(TypeId id, Text name) {
  const Type t = types_[id];
  switch (t.kind) {
    case TypeKind::kModule:
      return AttributeOfModule(t.a, name);
    case TypeKind::kSuper: {
      uint8_t doubt = 0;
      Value value;
      for (const Member& member : MembersOf(Just(id), name, doubt)) {
        for (const TypeId self : types_.CopyOf(types_.ArgOf(id, 0)))
          value = types_.Union(value, ValueOfMember(member, name, self, types_[self].kind == TypeKind::kClass));
      }
      value.doubt |= doubt;
      return value;
    }
    case TypeKind::kTypeForm: {
      Value value;
      for (const TypeId inner : types_.CopyOf(types_.ArgOf(id, 0)))
        if (types_[inner].kind == TypeKind::kInstance)
          value = types_.Union(value, AttributeOfType(types_.Add(TypeKind::kClass, types_[inner].a), name));
      return value.IsKnown() ? value : kUnknownValue;
    }
    case TypeKind::kTypeVar: {
      uint8_t doubt = 0;
      Value value;
      for (const Member& member : MembersOf(Just(id), name, doubt))
        value = types_.Union(value, ValueOfMember(member, name, InstanceOf(member.owner), false));
      return value.IsKnown() ? value : kUnknownValue;
    }
    case TypeKind::kSpecial:
      return kUnknownValue;
    case TypeKind::kForeign:
      return ForeignValue(std::string(names_[t.a]) + "." + std::string(name), ImportOfForeign(t.a));
    default:
      break;
  }
  const bool on_class = t.kind == TypeKind::kClass;
  if (name == "__class__") {
    const ClassId cls = ClassOfType(id);
    return cls == kNoId ? kUnknownValue : Just(types_.Add(TypeKind::kClass, cls));
  }
  if (on_class) {
    if (const auto member = FindMember(t.a, name, true)) {
      const Value value = ValueOfMember(*member, name, id, true);
      if (value.IsKnown() || member->owner != ClassNamed("builtins", "object")) return value;
    }
    const ClassId metaclass = ClassOfType(id);
    if (const auto member = FindMember(metaclass, name)) return ValueOfMember(*member, name, id, false);
    return ForeignMember(t.a, name);
  }
  if (t.kind == TypeKind::kInstance && t.args_count == 1 && classes_[t.a].name == "type") {
    Value value;
    for (const TypeId inner : types_.CopyOf(types_.ArgOf(id, 0)))
      if (types_[inner].kind == TypeKind::kInstance)
        value = types_.Union(value, AttributeOfType(types_.Add(TypeKind::kClass, types_[inner].a), name));
    if (value.IsKnown()) return value;
  }
  const ClassId cls = ClassOfType(id);
  if (cls == kNoId) return kUnknownValue;
  if (t.kind == TypeKind::kInstance && classes_[cls].is_enum && (name == "value" || name == "_value_")) {
    const Text literal = LiteralOf(t);
    Value value;
    ClassInfo& info = MembersOf(cls);
    const SourceFile* file = FileOf(info.file);
    for (const auto& [member_name, symbol] : info.symbols)
      if (file != nullptr && (literal.empty() || literal == member_name) && !member_name.starts_with("_") &&
          file->syntax.stmts.size() > 1) {
        const Value one = ValueOfVariable(*file, symbol, kNoFrame);
        for (const TypeId part : types_.CopyOf(one.set)) {
          if (types_[part].kind == TypeKind::kFunction) continue;
          const bool is_auto = types_[part].kind == TypeKind::kInstance && classes_[types_[part].a].name == "auto";
          value = types_.Union(
              value, !is_auto
                         ? Just(part)
                         : InstanceNamed("builtins", IsSubclass(cls, ClassNamed("builtins", "str")) ? "str" : "int"));
        }
      }
    if (value.IsKnown()) return WithoutLiterals(value);
  }
  if (const auto member = FindMember(cls, name)) return ValueOfMember(*member, name, id, false);
  static constexpr Text kFallbacks[] = {"__getattr__", "__getattribute__"};
  for (const Text fallback : kFallbacks) {
    const auto member = FindMember(cls, fallback);
    if (!member || member->owner == ClassNamed("builtins", "object")) continue;
    Value result = CallMethod(Just(id), fallback, {InstanceNamed("builtins", "str")});
    result.doubt |= Value::kOpen;
    return result;
  }
  const Value foreign = ForeignMember(cls, name);
  return foreign.IsKnown() || t.kind != TypeKind::kInstance ? foreign : AttributeBelow(cls, name);
}

// What a class may have from a base that is not there.
Value Inference::ForeignMember(ClassId cls, Text name) {
  const std::vector<BaseClass> order = InfoOf(cls).order;
  for (const BaseClass& entry : order) {
    const uint32_t base = classes_[entry.cls].foreign_base;
    if (base != kNoId) return ForeignValue(std::string(names_[base]) + "." + std::string(name), ImportOfForeign(base));
  }
  return kUnknownValue;
}

}  // namespace quillet
