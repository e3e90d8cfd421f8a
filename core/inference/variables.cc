// What a name was given, by its bindings.
#include <algorithm>
#include <array>

#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

namespace {

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
      return occurrence.binds() && occurrence.kind != NameKind::kImport;
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

}  // namespace quillet
