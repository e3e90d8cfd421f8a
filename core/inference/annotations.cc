// What annotations say.
#include <algorithm>

#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

namespace {

struct FormRow {
  Text name;
  SpecialForm form;
};
constexpr FormRow kForms[] = {
#define QUILLET_SPECIAL_FORM(identifier, name) {name, SpecialForm::k##identifier},
#include "inference/special_forms.def"
};

// The classes that names of the typing module stand for.
struct AliasRow {
  Text name, module, cls;
};
constexpr AliasRow kAliases[] = {
    {"List", "builtins", "list"},
    {"Dict", "builtins", "dict"},
    {"Set", "builtins", "set"},
    {"FrozenSet", "builtins", "frozenset"},
    {"Deque", "collections", "deque"},
    {"DefaultDict", "collections", "defaultdict"},
    {"Counter", "collections", "Counter"},
    {"ChainMap", "collections", "ChainMap"},
    {"OrderedDict", "collections", "OrderedDict"},
    {"Text", "builtins", "str"},
};

}  // namespace

SpecialForm Inference::SpecialFormOf(const Binding& binding, const SourceFile& file) {
  const uint32_t index = file.OccurrenceBeginningAt(binding.offset);
  if (index == kNoIndex) return SpecialForm::kNone;
  const Text name = file.bindings.TextOf(file.bindings.occurrences[index]);
  for (const FormRow& row : kForms)
    if (!row.name.empty() && row.name == name) return row.form;
  return SpecialForm::kNone;
}

Value Inference::ValueOfHint(FileId id, ExprId hint, FrameId) {
  const SourceFile* file = FileOf(id);
  if (file == nullptr || hint == kNoExpr) return kUnknownValue;
  const InFrame in_frame(*this, kNoFrame);
  return Remembered(hints_, KeyOf(id, hint, 0), [&] { return HintOf(*file, hint, kNoFrame); });
}

// A value of what an expression is, where that is a type.
Value Inference::HintOfValue(Value value) {
  Value hint{kNoTypes, value.doubt};
  for (const TypeId id : types_.CopyOf(value.set)) {
    const Type t = types_[id];
    switch (t.kind) {
      case TypeKind::kClass: {
        const std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
        hint = types_.Union(hint, Just(InstanceOf(t.a, args)));
        break;
      }
      case TypeKind::kNone:
      case TypeKind::kTypeVar:
        hint = types_.Union(hint, Just(id));
        break;
      case TypeKind::kTypeForm:
        hint = types_.Union(hint, Value{types_.ArgOf(id, 0), 0});
        break;
      case TypeKind::kSpecial:
        switch (static_cast<SpecialForm>(t.a)) {
          case SpecialForm::kSelf:
            hint = types_.Union(hint, Just(id));
            break;
          case SpecialForm::kLiteralString:
            hint = types_.Union(hint, InstanceNamed("builtins", "str"));
            break;
          case SpecialForm::kTuple:
            hint = types_.Union(hint, InstanceNamed("builtins", "tuple"));
            break;
          case SpecialForm::kType:
            hint = types_.Union(hint, InstanceNamed("builtins", "type"));
            break;
          case SpecialForm::kCallable:
            hint = types_.Union(hint, Just(types_.Add(TypeKind::kCallable, 0, 0, {kNoTypes})));
            break;
          case SpecialForm::kNever:
          case SpecialForm::kNoReturn:
            break;
          default:
            hint.doubt |= Value::kOpen;
        }
        break;
      case TypeKind::kInstance:
        // `TypeVar("T")` behind a name that inference could not follow, `Any` as a class.
        hint.doubt |= Value::kOpen;
        break;
      default:
        hint.doubt |= Value::kOpen;
    }
  }
  return hint;
}

Value Inference::HintOf(const SourceFile& file, ExprId hint, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  switch (syntax[hint].kind) {
    case ExprKind::kName:
    case ExprKind::kAttribute:
      return HintOfName(file, hint, frame);
    case ExprKind::kSubscript:
      return HintOfSubscript(file, hint, frame);
    case ExprKind::kString: {
      const ExprId inner = syntax.ChildOf(hint, 0);
      return (syntax[hint].flags & kHoldsHint) != 0 && inner != kNoExpr ? ValueOfHint(file.id, inner, frame)
                                                                        : kUnknownValue;
    }
    case ExprKind::kConstant:
      return syntax[hint].op == static_cast<uint8_t>(ConstantValue::kNone) ? NoneValue() : kUnknownValue;
    case ExprKind::kBinary:
      return types_.Union(ValueOfHint(file.id, syntax.ChildOf(hint, 0), frame),
                          ValueOfHint(file.id, syntax.ChildOf(hint, 1), frame));
    case ExprKind::kStarred:
      return kUnknownValue;
    case ExprKind::kTuple: {  // of a type comment: `# type: int, str`
      std::vector<TypeSetId> items;
      for (const ExprId item : syntax.ChildrenOf(hint)) items.push_back(ValueOfHint(file.id, item, frame).Packed());
      return Just(types_.Add(TypeKind::kTuple, 0, 0, items));
    }
    case ExprKind::kSignatureHint: {
      const auto parts = syntax.ChildrenOf(hint);
      return parts.empty() ? kUnknownValue : ValueOfHint(file.id, parts.back(), frame);
    }
    default:
      return HintOfValue(ValueOf(file.id, hint, frame));
  }
}

Value Inference::HintOfName(const SourceFile& file, ExprId hint, FrameId frame) {
  const Value value = ValueOf(file.id, hint, frame);
  return value.IsKnown() ? HintOfValue(value) : kUnknownValue;
}

Value Inference::HintOfSpecial(SpecialForm form, const SourceFile& file, std::span<const ExprId> items, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const auto all = [&] {
    Value value;
    for (const ExprId item : items) value = types_.Union(value, ValueOfHint(file.id, item, frame));
    return value;
  };
  switch (form) {
    case SpecialForm::kUnion:
      return all();
    case SpecialForm::kOptional:
      return types_.Union(all(), NoneValue());
    case SpecialForm::kClassVar:
    case SpecialForm::kFinal:
    case SpecialForm::kAnnotated:
    case SpecialForm::kRequired:
    case SpecialForm::kNotRequired:
    case SpecialForm::kReadOnly:
      return items.empty() ? kUnknownValue : ValueOfHint(file.id, items[0], frame);
    case SpecialForm::kTypeGuard:
    case SpecialForm::kTypeIs:
      return InstanceNamed("builtins", "bool");
    case SpecialForm::kTuple: {
      if (items.size() == 2 && syntax[items[1]].kind == ExprKind::kConstant)
        return InstanceNamed("builtins", "tuple", {ValueOfHint(file.id, items[0], frame).Packed()});
      std::vector<TypeSetId> sets;
      for (const ExprId item : items) {
        if (syntax[item].kind == ExprKind::kTuple && syntax[item].children_count == 0) continue;  // Tuple[()]
        if (syntax[item].kind == ExprKind::kStarred) return InstanceNamed("builtins", "tuple");
        sets.push_back(ValueOfHint(file.id, item, frame).Packed());
      }
      return Just(types_.Add(TypeKind::kTuple, 0, 0, sets));
    }
    case SpecialForm::kType: {
      Value value;
      const Value inner = all();
      std::vector<TypeId> others;
      for (const TypeId id : types_.CopyOf(inner.set)) {
        if (types_[id].kind == TypeKind::kInstance) {
          const std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
          value = types_.Union(value, Just(types_.Add(TypeKind::kClass, types_[id].a, 0, args)));
        } else {
          others.push_back(id);
        }
      }
      if (!others.empty()) value = types_.Union(value, InstanceNamed("builtins", "type", {types_.SetOf(others)}));
      if (!value.IsKnown()) return InstanceNamed("builtins", "type");
      value.doubt |= inner.doubt;
      return value;
    }
    case SpecialForm::kLiteral: {
      Value value;
      for (const ExprId item : items) value = types_.Union(value, ValueOf(file.id, item, frame));
      return value;
    }
    case SpecialForm::kCallable: {
      if (items.empty()) return kUnknownValue;
      std::vector<TypeSetId> args{ValueOfHint(file.id, items.back(), frame).Packed()};
      const bool has_parameters = items.size() == 2 && syntax[items[0]].kind == ExprKind::kList;
      if (has_parameters)
        for (const ExprId item : syntax.ChildrenOf(items[0]))
          args.push_back(ValueOfHint(file.id, item, frame).Packed());
      return Just(types_.Add(TypeKind::kCallable, 0, has_parameters ? 1 : 0, args));
    }
    default:
      return kUnknownValue;
  }
}

Value Inference::HintOfSubscript(const SourceFile& file, ExprId hint, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const auto items = syntax.ChildrenOf(hint).subspan(1);
  const Value base = ValueOf(file.id, syntax.ChildOf(hint, 0), frame);
  Value value{kNoTypes, base.doubt};
  for (const TypeId id : types_.CopyOf(base.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kSpecial) {
      value = types_.Union(value, HintOfSpecial(static_cast<SpecialForm>(t.a), file, items, frame));
    } else if (t.kind == TypeKind::kClass) {
      const ClassId cls = t.a;
      if (cls == ClassNamed("builtins", "tuple")) {
        value = types_.Union(value, HintOfSpecial(SpecialForm::kTuple, file, items, frame));
        continue;
      }
      if (cls == ClassNamed("builtins", "type")) {
        value = types_.Union(value, HintOfSpecial(SpecialForm::kType, file, items, frame));
        continue;
      }
      std::vector<TypeSetId> args;
      for (const ExprId item : items) args.push_back(ValueOfHint(file.id, item, frame).Packed());
      value = types_.Union(value, Just(InstanceOf(cls, args)));
    } else if (t.kind == TypeKind::kTypeForm) {
      // An alias with type variables, in the order of their first mention.
      std::vector<TypeId> variables;
      CollectTypeVars(types_.ArgOf(id, 0), variables);
      Solution solution;
      for (size_t i = 0; i < variables.size() && i < items.size(); ++i)
        solution.emplace_back(variables[i], ValueOfHint(file.id, items[i], frame).Packed());
      value = types_.Union(value, Substitute({types_.ArgOf(id, 0), 0}, solution));
    } else {
      value.doubt |= Value::kOpen;
    }
  }
  return value;
}

// The value of a name of the typing module that its stub does not say: forms, and aliases of classes.
Value Inference::FormOf(const SourceFile& file, ExprId target) {
  const ModuleId module = modules_.OfFile(file.id);
  if (module == kNoModule) return kUnknownValue;
  const std::string& name = modules_[module].name;
  if (name != "typing" && name != "typing_extensions") return kUnknownValue;
  const Text text = file.syntax.NameOf(target);
  for (const AliasRow& row : kAliases) {
    if (row.name != text) continue;
    const ClassId cls = ClassNamed(row.module, row.cls);
    return cls == kNoId ? kUnknownValue : Just(types_.Add(TypeKind::kClass, cls));
  }
  const SpecialForm form = SpecialFormOf({file.id, file.syntax[target].begin}, file);
  return form == SpecialForm::kNone ? kUnknownValue : Just(types_.Add(TypeKind::kSpecial, static_cast<uint32_t>(form)));
}

}  // namespace quillet
