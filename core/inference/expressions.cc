// What expressions are.
#include <algorithm>
#include <tuple>

#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

namespace {

struct OperatorRow {
  Text text, method, reflected;
};
constexpr OperatorRow kOperators[] = {
    {"+", "__add__", "__radd__"},
    {"-", "__sub__", "__rsub__"},
    {"*", "__mul__", "__rmul__"},
    {"/", "__truediv__", "__rtruediv__"},
    {"//", "__floordiv__", "__rfloordiv__"},
    {"%", "__mod__", "__rmod__"},
    {"**", "__pow__", "__rpow__"},
    {"|", "__or__", "__ror__"},
    {"&", "__and__", "__rand__"},
    {"^", "__xor__", "__rxor__"},
    {"<<", "__lshift__", "__rlshift__"},
    {">>", "__rshift__", "__rrshift__"},
    {"@", "__matmul__", "__rmatmul__"},
};

// What a string literal, of one piece or several, holds as it is spelled: in front of it `b` for bytes, of which Python
// 2 makes no difference. Empty where it is none, is made when it runs, or may be spelled in another way.
std::string KeyInLiteral(Text literal, bool is_python2) {
  std::string key(1, 's');
  while (!literal.empty()) {
    size_t quote = 0;
    char kind = 's';
    bool is_piece_raw = false;
    for (; quote < literal.size() && literal[quote] != '\'' && literal[quote] != '"'; ++quote) {
      const char c = static_cast<char>(literal[quote] | 0x20);
      if (c == 'r') is_piece_raw = true;
      if (c == 'b' && !is_python2) kind = 'b';
      if (c == 'f' || c == 't' || c == '#') return {};
      if (c != 'r' && c != 'b' && c != 'u' && Text(" \t\r\n\\").find(literal[quote]) == Text::npos) return {};
    }
    if (quote == literal.size()) break;  // blanks
    const Text one = literal.substr(quote, 1);
    const Text three = literal.substr(quote, 3);
    const Text mark = three.size() == 3 && three[1] == one[0] && three[2] == one[0] ? three : one;
    size_t end = quote + mark.size();
    while (end < literal.size() && literal.substr(end, mark.size()) != mark) end += literal[end] == '\\' ? 2 : 1;
    if (end >= literal.size()) return {};
    const Text piece = literal.substr(quote + mark.size(), end - quote - mark.size());
    const bool has_escape = piece.find('\\') != Text::npos;
    if (has_escape && is_piece_raw) return {};
    key[0] = kind;
    key += piece;
    literal.remove_prefix(end + mark.size());
  }
  return key;
}

}  // namespace

Value Inference::ValueOf(FileId id, ExprId expr, FrameId frame) {
  const SourceFile* file = FileOf(id);
  if (file == nullptr || expr == kNoExpr) return kUnknownValue;
  if (frame != kNoFrame) frame = FrameFor(*file, file->ScopeAround(expr), frame);
  const InFrame in_frame(*this, frame);
  return Remembered(values_, KeyOf(id, expr, frame), [&] { return Evaluate(*file, expr, frame); });
}

Value Inference::Evaluate(const SourceFile& file, ExprId expr, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const Expr& e = syntax[expr];
  const auto child = [&](size_t i) { return ValueOf(file.id, syntax.ChildOf(expr, i), frame); };
  switch (e.kind) {
    case ExprKind::kName:
      return EvaluateName(file, expr, frame);
    case ExprKind::kNumber:
      switch (static_cast<NumberType>(e.op)) {
        case NumberType::kFloat:
          return InstanceNamed("builtins", "float");
        case NumberType::kComplex:
          return InstanceNamed("builtins", "complex");
        default:
          return LiteralValue("int", syntax.TextOf(e));
      }
    case ExprKind::kString:
      return EvaluateString(file, expr);
    case ExprKind::kConstant:
      switch (static_cast<ConstantValue>(e.op)) {
        case ConstantValue::kNone:
          return NoneValue();
        case ConstantValue::kEllipsis:
          return InstanceNamed("types", "EllipsisType");
        default:
          return LiteralValue("bool", syntax.TextOf(e));
      }
    case ExprKind::kAttribute:
      return EvaluateAttribute(file, expr, frame);
    case ExprKind::kSubscript:
      return EvaluateSubscript(file, expr, frame);
    case ExprKind::kSlice:
      return InstanceNamed("builtins", "slice");
    case ExprKind::kCall:
      return EvaluateCall(file, expr, frame);
    case ExprKind::kTuple:
      return EvaluateTuple(file, expr, frame);
    case ExprKind::kList:
      return EvaluateItems(file, expr, frame, "list");
    case ExprKind::kSet:
      return EvaluateItems(file, expr, frame, "set");
    case ExprKind::kDict:
      return EvaluateDict(file, expr, frame);
    case ExprKind::kUnary: {
      if (e.op == word::kNot) return InstanceNamed("builtins", "bool");
      const ExprId number = syntax.ChildOf(expr, 0);
      if (e.op == CodeOfText("-") && number != kNoExpr && syntax[number].kind == ExprKind::kNumber &&
          static_cast<NumberType>(syntax[number].op) != NumberType::kFloat &&
          static_cast<NumberType>(syntax[number].op) != NumberType::kComplex)
        return LiteralValue("int", "-" + std::string(syntax.TextOf(syntax[number])));
      const Text method = e.op == CodeOfText("-") ? "__neg__" : e.op == CodeOfText("+") ? "__pos__" : "__invert__";
      const Value operand = WithoutLiterals(child(0));
      const Value result = CallMethod(operand, method, {});
      return result.IsKnown() ? result : operand;
    }
    case ExprKind::kBinary:
      return EvaluateBinary(file, expr, frame);
    case ExprKind::kBoolean: {
      const Value left = child(0), right = child(1);
      if (e.op == word::kOr) return types_.Union(WithoutFalse(left, false), right);
      return types_.Union(WithoutFalse(left, true), right);
    }
    case ExprKind::kCompare: {
      const auto op = static_cast<CompareOperator>(e.op);
      static constexpr Text kMethods[] = {"__eq__", "__ne__", "__lt__", "__gt__", "__le__", "__ge__"};
      if (e.children_count == 2 && static_cast<size_t>(op) < std::size(kMethods)) {
        const Value left = child(0);
        // Comparisons that give something else, as arrays and columns do.
        for (const TypeId id : types_.CopyOf(left.set)) {
          if (types_[id].kind != TypeKind::kInstance ||
              modules_[modules_.OfFile(classes_[types_[id].a].file)].name == "builtins")
            continue;
          const auto member = FindMember(types_[id].a, kMethods[static_cast<size_t>(op)]);
          if (!member || member->owner == ClassNamed("builtins", "object")) continue;
          const Value result = CallMethod(Just(id), kMethods[static_cast<size_t>(op)], {child(1)});
          if (result.IsKnown()) return result;
        }
      }
      return InstanceNamed("builtins", "bool");
    }
    case ExprKind::kConditional: {
      const int truth = StaticTruth(file, syntax.ChildOf(expr, 1));
      if (truth == 1) return child(0);
      if (truth == 0) return child(2);
      return types_.Union(child(0), child(2));
    }
    case ExprKind::kLambda:
      return Just(types_.Add(TypeKind::kFunction, FunctionOfLambda(file.id, expr), frame));
    case ExprKind::kListComprehension:
    case ExprKind::kSetComprehension:
    case ExprKind::kDictComprehension:
    case ExprKind::kGenerator:
      return EvaluateComprehension(file, expr, frame);
    case ExprKind::kAwait:
      return EvaluateAwait(child(0));
    case ExprKind::kYieldFrom: {
      // What the generator returns.
      Value value{kNoTypes, Value::kOpen};
      const ClassId generator = ClassNamed("typing", "Generator");
      for (const TypeId id : types_.CopyOf(child(0).set))
        if (types_[id].kind == TypeKind::kInstance && types_[id].a == generator)
          value = Value{types_.Union(value.set, types_.ArgOf(id, 2)), 0};
      return value.IsKnown() || !IterationOf(child(0)).IsKnown() ? value : NoneValue();
    }
    case ExprKind::kNamed:
      return child(1);
    case ExprKind::kStarred:
    case ExprKind::kDoubleStarred:
    case ExprKind::kKeyword:
      return child(0);
    case ExprKind::kBackquote:
      return InstanceNamed("builtins", "str");
    case ExprKind::kPatternValue:
      return child(0);
    default:
      return kUnknownValue;
  }
}

Value Inference::EvaluateName(const SourceFile& file, ExprId expr, FrameId frame) {
  const uint32_t index = file.OccurrenceBeginningAt(file.syntax[expr].begin);
  if (index == kNoIndex) return kUnknownValue;
  return Narrowed(file, expr, ValueOfName(file, index, frame), frame);
}

Value Inference::EvaluateAttribute(const SourceFile& file, ExprId expr, FrameId frame) {
  const Value receiver = ValueOf(file.id, file.syntax.ChildOf(expr, 0), frame);
  const Text name = file.syntax.NameOf(expr);
  return Narrowed(file, expr, receiver.IsKnown() ? AttributeOf(receiver, name) : kUnknownValue, frame);
}

Value Inference::EvaluateString(const SourceFile& file, ExprId expr) {
  const uint8_t bits = file.syntax[expr].op;
  if ((bits & kStringTemplate) != 0) return InstanceNamed("string.templatelib", "Template");
  if ((bits & kStringBytes) != 0 && !file.is_python2)
    return LiteralValue("bytes", file.syntax.TextOf(file.syntax[expr]));
  if ((bits & kStringFormatted) != 0) return InstanceNamed("builtins", "str");
  return LiteralValue("str", file.syntax.TextOf(file.syntax[expr]));
}

Value Inference::WithoutLiterals(Value value) {
  std::vector<TypeId> plain;
  bool has_literal = false;
  for (const TypeId id : types_.CopyOf(value.set)) {
    const Type t = types_[id];
    if (t.kind != TypeKind::kInstance || t.b == 0 || classes_[t.a].is_enum) {
      plain.push_back(id);
      continue;
    }
    has_literal = true;
    const std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
    plain.push_back(InstanceOf(t.a, args));
  }
  return has_literal ? Value{types_.SetOf(plain), value.doubt} : value;
}

Value Inference::EvaluateTuple(const SourceFile& file, ExprId expr, FrameId frame) {
  std::vector<TypeSetId> items;
  for (const ExprId item : file.syntax.ChildrenOf(expr)) {
    const Value value = ValueOf(file.id, item, frame);
    if (file.syntax[item].kind != ExprKind::kStarred) {
      items.push_back(value.Packed());
      continue;
    }
    if (types_.SizeOf(value.set) == 1 && types_[types_.TypesOf(value.set)[0]].kind == TypeKind::kTuple) {
      const TypeId tuple = types_.TypesOf(value.set)[0];
      for (size_t i = 0; i < types_[tuple].args_count; ++i) items.push_back(types_.ArgOf(tuple, i));
      continue;
    }
    Value all;
    for (const ExprId one : file.syntax.ChildrenOf(expr)) {
      const Value part = ValueOf(file.id, one, frame);
      all = types_.Union(all, file.syntax[one].kind == ExprKind::kStarred ? IterationOf(part) : part);
    }
    return InstanceNamed("builtins", "tuple", {WithoutLiterals(all).Packed()});
  }
  static constexpr size_t kMaxItems = 64;
  if (items.size() > kMaxItems) {
    Value all;
    for (const TypeSetId item : items) all = types_.Union(all, Value{item, 0});
    return InstanceNamed("builtins", "tuple", {WithoutLiterals(all).Packed()});
  }
  return Just(types_.Add(TypeKind::kTuple, 0, 0, items));
}

Value Inference::EvaluateItems(const SourceFile& file, ExprId expr, FrameId frame, Text cls) {
  static constexpr size_t kMaxItems = 64;
  Value items;
  size_t count = 0;
  for (const ExprId item : file.syntax.ChildrenOf(expr)) {
    if (++count > kMaxItems) {
      items.doubt |= Value::kOpen;
      break;
    }
    const Value value = ValueOf(file.id, item, frame);
    items =
        types_.Union(items, WithoutLiterals(file.syntax[item].kind == ExprKind::kStarred ? IterationOf(value) : value));
  }
  const ClassId id = ClassNamed("builtins", cls);
  if (id == kNoId) return kUnknownValue;
  // A display remembers itself, for `[f, g][1]`.
  const std::string place = "@" + std::to_string(file.id) + ":" + std::to_string(expr) + ":" + std::to_string(frame);
  const TypeSetId args[] = {items.Packed()};
  return Just(types_.Add(TypeKind::kInstance, id, cls == "list" && count > 0 ? LiteralNumber(place) : 0, args));
}

Value Inference::EvaluateDict(const SourceFile& file, ExprId expr, FrameId frame) {
  static constexpr size_t kMaxItems = 128;
  const auto children = file.syntax.ChildrenOf(expr);
  Value keys, values;
  for (size_t i = 0; i + 1 < children.size() && i < kMaxItems; i += 2) {
    if (file.syntax[children[i]].kind == ExprKind::kDoubleStarred) {
      const Value other = ValueOf(file.id, children[i], frame);
      if (!other.IsKnown() || other.doubt != 0) values.doubt |= Value::kOpen;
      for (const TypeId id : types_.CopyOf(other.set)) {
        keys = types_.Union(keys, Value{types_.ArgOf(id, 0), 0});
        values = types_.Union(values, Value{types_.ArgOf(id, 1), 0});
      }
      continue;
    }
    keys = types_.Union(keys, WithoutLiterals(ValueOf(file.id, children[i], frame)));
    values = types_.Union(values, WithoutLiterals(ValueOf(file.id, children[i + 1], frame)));
  }
  const ClassId id = ClassNamed("builtins", "dict");
  if (id == kNoId) return kUnknownValue;
  const std::string place = "@" + std::to_string(file.id) + ":" + std::to_string(expr) + ":" + std::to_string(frame);
  const TypeSetId args[] = {keys.Packed(), values.Packed()};
  return Just(types_.Add(TypeKind::kInstance, id, children.empty() ? 0 : LiteralNumber(place), args));
}

Value Inference::EvaluateComprehension(const SourceFile& file, ExprId expr, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const Value first = WithoutLiterals(ValueOf(file.id, syntax.ChildOf(expr, 0), frame));
  switch (syntax[expr].kind) {
    case ExprKind::kListComprehension:
      return InstanceNamed("builtins", "list", {first.Packed()});
    case ExprKind::kSetComprehension:
      return InstanceNamed("builtins", "set", {first.Packed()});
    case ExprKind::kDictComprehension:
      return InstanceNamed(
          "builtins", "dict",
          {first.Packed(), WithoutLiterals(ValueOf(file.id, syntax.ChildOf(expr, 1), frame)).Packed()});
    default:
      for (const ExprId clause : syntax.ChildrenOf(expr))
        if (syntax[clause].kind == ExprKind::kComprehensionFor && (syntax[clause].flags & kAsyncClause) != 0)
          return InstanceNamed("typing", "AsyncGenerator", {first.Packed(), NoneValue().set});
      return InstanceNamed("typing", "Generator", {first.Packed(), NoneValue().set, NoneValue().set});
  }
}

Value Inference::EvaluateAwait(Value awaited) {
  Value value{kNoTypes, awaited.doubt};
  const ClassId coroutine = ClassNamed("typing", "Coroutine");
  const ClassId generator = ClassNamed("typing", "Generator");
  for (const TypeId id : types_.CopyOf(awaited.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kInstance && t.a == coroutine) {
      value = types_.Union(value, Value{types_.ArgOf(id, 2), 0});
      continue;
    }
    const Value steps = CallMethod(Just(id), "__await__", {});
    for (const TypeId step : types_.CopyOf(steps.set)) {
      if (types_[step].kind == TypeKind::kInstance && IsSubclass(types_[step].a, generator))
        value = types_.Union(value, Value{ArgsAs(step, generator, 2), 0});
    }
  }
  if (!value.IsKnown()) value.doubt |= Value::kOpen;
  return value;
}

Value Inference::CallMethod(Value receiver, Text name, std::initializer_list<Value> arguments, bool* has_method) {
  Value value{kNoTypes, receiver.doubt};
  if (has_method != nullptr) *has_method = false;
  for (const TypeId id : types_.CopyOf(receiver.set)) {
    const Type t = types_[id];
    const ClassId cls = ClassOfType(id);
    const auto member = FindMember(cls, name);
    if (!member) {
      value.doubt |= t.kind == TypeKind::kNone ? 0 : Value::kOpen;
      continue;
    }
    if (has_method != nullptr) *has_method = true;
    std::vector<Argument> given;
    for (const Value& argument : arguments) {
      Argument one;
      one.value = argument;
      one.is_evaluated = true;
      given.push_back(std::move(one));
    }
    const Value method = ValueOfMember(*member, name, id, false);
    const Value result = ResultOf(method, given);
    value.set = types_.Union(value.set, result.set);
    value.doubt |= result.doubt;
  }
  return value;
}

Value Inference::IterationOf(Value iterable, bool is_async) {
  Value value{kNoTypes, iterable.doubt};
  for (const TypeId id : types_.CopyOf(iterable.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kTuple && !is_async) {
      for (size_t i = 0; i < t.args_count; ++i) value = types_.Union(value, Value{types_.ArgOf(id, i), 0});
      continue;
    }
    if (t.kind == TypeKind::kClass && InfoOf(t.a).is_enum) {
      value = types_.Union(value, Just(InstanceOf(t.a)));
      continue;
    }
    if (t.kind == TypeKind::kNone) continue;
    const Value iterator = CallMethod(Just(id), is_async ? "__aiter__" : "__iter__", {});
    if (iterator.IsKnown()) {
      const Value item = CallMethod(iterator, is_async ? "__anext__" : "__next__", {});
      value = types_.Union(value, is_async                     ? EvaluateAwait(item)
                                  : item.IsKnown() || is_async ? item
                                                               : CallMethod(iterator, "next", {}));
    } else {
      value = types_.Union(value, CallMethod(Just(id), "__getitem__", {InstanceNamed("builtins", "int")}));
    }
  }
  if (!value.IsKnown()) value.doubt |= Value::kOpen;
  return value;
}

// What a subscript that is no type takes out of a container.
Value Inference::ItemOf(Value container, const SourceFile& file, std::span<const ExprId> items, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  Value value{kNoTypes, container.doubt};
  const ExprId index = items.empty() ? kNoExpr : items[0];
  Value key;
  if (items.size() == 1 && (index == kNoExpr || (syntax[index].flags & kTrailingComma) == 0)) {
    key = ValueOf(file.id, index, frame);
  } else {
    std::vector<TypeSetId> parts;
    for (const ExprId item : items) parts.push_back(ValueOf(file.id, item, frame).Packed());
    key = Just(types_.Add(TypeKind::kTuple, 0, 0, parts));
  }
  // A literal number; LONG_MIN without one.
  long number = INT32_MIN;
  if (index != kNoExpr && items.size() == 1) {
    const bool is_negative = syntax[index].kind == ExprKind::kUnary && syntax[index].op == CodeOfText("-");
    const ExprId digits = is_negative ? syntax.ChildOf(index, 0) : index;
    const auto read = [&](Text text) {
      const bool is_below = is_negative || text.starts_with('-');
      if (text.starts_with('-')) text.remove_prefix(1);
      if (text.empty() || text.size() > 6 || !std::ranges::all_of(text, [](char c) { return c >= '0' && c <= '9'; }))
        return;
      number = 0;
      for (const char c : text) number = number * 10 + (c - '0');
      if (is_below) number = -number;
    };
    if (digits != kNoExpr && syntax[digits].kind == ExprKind::kNumber) {
      read(syntax.TextOf(syntax[digits]));
    } else if (types_.SizeOf(key.set) == 1) {
      const Type t = types_[types_.TypesOf(key.set)[0]];
      if (t.kind == TypeKind::kInstance && t.b != 0) read(LiteralOf(t));
    }
  }
  const auto literal_key = [&]() -> Text {
    if (types_.SizeOf(key.set) != 1) return kNoText;
    return LiteralOf(types_[types_.TypesOf(key.set)[0]]);
  }();
  const auto unquoted = [](Text text) {
    while (!text.empty() && text.front() != '\'' && text.front() != '"') text.remove_prefix(1);
    return text.size() >= 2 ? text.substr(1, text.size() - 2) : Text();
  };
  const bool is_string = !IsNone(literal_key) && literal_key.find_first_of("'\"") != Text::npos;
  const std::string string_key = is_string ? KeyInLiteral(literal_key, file.is_python2) : std::string();
  for (const TypeId id : types_.CopyOf(container.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kTuple) {
      const auto count = static_cast<long>(t.args_count);
      const long at = number < 0 && number != INT32_MIN ? count + number : number;
      if (at >= 0 && at < count) {
        value = types_.Union(value, Value{types_.ArgOf(id, static_cast<size_t>(at)), 0});
        continue;
      }
      if (index != kNoExpr && syntax[index].kind == ExprKind::kSlice) {
        Value all;
        for (size_t i = 0; i < t.args_count; ++i) all = types_.Union(all, Value{types_.ArgOf(id, i), 0});
        value = types_.Union(value, InstanceNamed("builtins", "tuple", {all.Packed()}));
        continue;
      }
      for (size_t i = 0; i < t.args_count; ++i) value = types_.Union(value, Value{types_.ArgOf(id, i), 0});
      continue;
    }
    if (t.kind == TypeKind::kInstance) {
      const Text literal = LiteralOf(t);
      // A display that is known item by item: what stands at the key.
      if (literal.starts_with('@')) {
        const size_t first = literal.find(':'), second = literal.find(':', first + 1);
        const auto to_number = [](Text text) {
          uint32_t result = 0;
          for (const char c : text) result = result * 10 + static_cast<uint32_t>(c - '0');
          return result;
        };
        const FileId display_file = to_number(literal.substr(1, first - 1));
        const ExprId display = to_number(literal.substr(first + 1, second - first - 1));
        const FrameId display_frame = to_number(literal.substr(second + 1));
        const SourceFile* source = FileOf(display_file);
        if (source != nullptr && display < source->syntax.exprs.size()) {
          const auto children = source->syntax.ChildrenOf(display);
          ExprId found = kNoExpr;
          if (source->syntax[display].kind == ExprKind::kList) {
            const auto count = static_cast<long>(children.size());
            const long at = number < 0 && number != INT32_MIN ? count + number : number;
            const bool has_star =
                std::ranges::any_of(children, [&](ExprId c) { return source->syntax[c].kind == ExprKind::kStarred; });
            if (at >= 0 && at < count && !has_star) found = children[static_cast<size_t>(at)];
          } else if (!IsNone(literal_key)) {
            for (size_t i = 0; i + 1 < children.size(); i += 2) {
              const Expr& entry = source->syntax[children[i]];
              const Text text = source->syntax.TextOf(entry);
              const bool is_same =
                  entry.kind == ExprKind::kString
                      ? is_string && !string_key.empty() && KeyInLiteral(text, file.is_python2) == string_key
                      : entry.kind == ExprKind::kNumber && text == literal_key;
              if (is_same) found = children[i + 1];
            }
          }
          if (found != kNoExpr) {
            value = types_.Union(value, ValueOf(display_file, found, display_frame));
            continue;
          }
        }
      }
      if (literal.starts_with('#') && !IsNone(literal_key)) {
        Value entry;
        for (const auto& [name, given] : EntriesOf(id))
          if (name == unquoted(literal_key)) entry = given;
        if (entry.IsKnown()) {
          value = types_.Union(value, entry);
          continue;
        }
      }
      ClassInfo& info = InfoOf(t.a);
      if (info.is_typed_dict && !IsNone(literal_key)) {
        const Value field = AttributeOfType(id, Kept(unquoted(literal_key)));
        if (field.IsKnown()) {
          value = types_.Union(value, field);
          continue;
        }
      }
      if (info.is_named_tuple && number >= 0 && static_cast<size_t>(number) < MembersOf(t.a).fields.size()) {
        value = types_.Union(value, AttributeOfType(id, classes_[t.a].fields[static_cast<size_t>(number)].name));
        continue;
      }
    }
    if (t.kind == TypeKind::kNone) continue;
    Value item = CallMethod(Just(id), "__getitem__", {key});
    if (types_.SizeOf(item.set) > 1) item.doubt |= Value::kGuessed;  // one of several
    value = types_.Union(value, item);
  }
  if (!value.IsKnown()) value.doubt |= Value::kOpen;
  return value;
}

std::string Inference::TextOfEntries(const std::vector<std::pair<Text, Value>>& entries) {
  std::string text = "#";
  for (const auto& [name, value] : entries) {
    text += name;
    text += ':';
    text += std::to_string(value.Packed());
    text += ';';
  }
  return text;
}

std::vector<std::pair<Text, Value>> Inference::EntriesOf(TypeId dict) {
  std::vector<std::pair<Text, Value>> entries;
  const Text literal = LiteralOf(types_[dict]);
  const auto to_number = [](Text text) {
    uint32_t number = 0;
    for (const char c : text) number = number * 10 + static_cast<uint32_t>(c - '0');
    return number;
  };
  if (literal.starts_with('#')) {
    for (size_t begin = 1; begin < literal.size();) {
      const size_t colon = literal.find(':', begin), end = literal.find(';', begin);
      entries.emplace_back(literal.substr(begin, colon - begin),
                           Value{to_number(literal.substr(colon + 1, end - colon - 1)), 0});
      begin = end + 1;
    }
  } else if (literal.starts_with('@')) {
    const size_t first = literal.find(':'), second = literal.find(':', first + 1);
    const FileId file = to_number(literal.substr(1, first - 1));
    const ExprId display = to_number(literal.substr(first + 1, second - first - 1));
    const FrameId frame = to_number(literal.substr(second + 1));
    const SourceFile* source = FileOf(file);
    if (source == nullptr || source->syntax[display].kind != ExprKind::kDict) return entries;
    const auto children = source->syntax.ChildrenOf(display);
    for (size_t i = 0; i + 1 < children.size(); i += 2) {
      if (source->syntax[children[i]].kind != ExprKind::kString) continue;
      Text key = source->syntax.TextOf(source->syntax[children[i]]);
      while (!key.empty() && key.front() != '\'' && key.front() != '"') key.remove_prefix(1);
      if (key.size() > 2) entries.emplace_back(key.substr(1, key.size() - 2), ValueOf(file, children[i + 1], frame));
    }
  }
  return entries;
}

// Whether a class says by a `__class_getitem__` of its own what it gives. Bases are not looked at: a subscript may be
// one of what they are found by.
bool Inference::SaysItems(ClassId cls) {
  const ClassInfo& info = classes_[cls];
  const SourceFile* file = FileOf(info.file);
  if (file == nullptr || file->is_stub || info.scope == kNoIndex) return false;
  const Bindings& bindings = file->bindings;
  for (uint32_t symbol = bindings.scopes[info.scope].first_symbol; symbol != kNoIndex;
       symbol = bindings.symbols[symbol].next)
    if (bindings.texts[bindings.symbols[symbol].name] == "__class_getitem__") return true;
  return false;
}

Value Inference::EvaluateSubscript(const SourceFile& file, ExprId expr, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const Value base = ValueOf(file.id, syntax.ChildOf(expr, 0), frame);
  const auto items = syntax.ChildrenOf(expr).subspan(1);
  Value value{kNoTypes, base.doubt};
  std::vector<TypeId> containers;
  bool is_type = false;
  for (const TypeId id : types_.CopyOf(base.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kClass) {
      if (InfoOf(t.a).is_enum) {
        value = types_.Union(value, Just(InstanceOf(t.a)));
        continue;
      }
      if (SaysItems(t.a)) {
        const Value given = items.empty() ? kUnknownValue : ValueOf(file.id, items[0], frame);
        std::vector<Argument> arguments(1);
        arguments[0].value = given;
        arguments[0].is_evaluated = true;
        const Value result = ResultOf(AttributeOfType(id, "__class_getitem__"), arguments);
        value = types_.Union(value, result);
        continue;
      }
      is_type = true;
    } else if (t.kind == TypeKind::kSpecial || t.kind == TypeKind::kTypeForm) {
      is_type = true;
    } else {
      containers.push_back(id);
    }
  }
  if (is_type) {
    const Value hint = HintOfSubscript(file, expr, frame);
    for (const TypeId id : types_.CopyOf(hint.set)) {
      const Type t = types_[id];
      if (t.kind == TypeKind::kInstance && hint.IsKnown() && types_.SizeOf(hint.set) == 1) {
        const std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
        value = types_.Union(value, Just(types_.Add(TypeKind::kClass, t.a, 0, args)));
        continue;
      }
      value = types_.Union(value, Just(types_.Add(TypeKind::kTypeForm, 0, 0, {hint.set})));
      break;
    }
  }
  if (!containers.empty())
    value = types_.Union(value, ItemOf({types_.SetOf(containers), base.doubt}, file, items, frame));
  if (!value.IsKnown()) value.doubt |= Value::kOpen;
  return Narrowed(file, expr, value, frame);
}

// What `get` gives of a typed dictionary by a key that is a literal: the field, or what stands for it.
Value Inference::GottenField(const SourceFile& file, std::span<const ExprId> call, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const ExprId method = call[0];
  if (syntax[method].kind != ExprKind::kAttribute || syntax.NameOf(method) != "get" || call.size() < 2 ||
      call.size() > 3)
    return kUnknownValue;
  for (const ExprId argument : call.subspan(1))
    if (syntax[argument].kind == ExprKind::kStarred || syntax[argument].kind == ExprKind::kDoubleStarred ||
        syntax[argument].kind == ExprKind::kKeyword)
      return kUnknownValue;
  const Value receiver = ValueOf(file.id, syntax.ChildOf(method, 0), frame);
  Value value{kNoTypes, receiver.doubt};
  for (const TypeId id : types_.CopyOf(receiver.set)) {
    if (types_[id].kind != TypeKind::kInstance || !InfoOf(types_[id].a).is_typed_dict) return kUnknownValue;
    const Value key = ValueOf(file.id, call[1], frame);
    if (types_.SizeOf(key.set) != 1) return kUnknownValue;
    const std::string name = KeyInLiteral(LiteralOf(types_[types_.TypesOf(key.set)[0]]), file.is_python2);
    if (name.size() < 2 || name[0] != 's' || !FindMember(types_[id].a, Kept(Text(name).substr(1))))
      return kUnknownValue;
    const Value field = AttributeOfType(id, Kept(Text(name).substr(1)));
    if (!field.IsKnown()) return kUnknownValue;
    value = types_.Union(value, field);
    value.doubt |= key.doubt;
  }
  if (!value.IsKnown()) return value;
  return types_.Union(value, call.size() > 2 ? WithoutLiterals(ValueOf(file.id, call[2], frame)) : NoneValue());
}

Value Inference::EvaluateCall(const SourceFile& file, ExprId expr, FrameId frame) {
  const auto children = file.syntax.ChildrenOf(expr);
  if (children.empty()) return kUnknownValue;
  if (const Value field = GottenField(file, children, frame); field.IsKnown()) return field;
  const Value callee = ValueOf(file.id, children[0], frame);
  if (!callee.IsKnown()) return kUnknownValue;
  std::vector<Argument> arguments = ArgumentsOf(file, children.subspan(1), frame);
  // `super()` is bound in its own frame.
  Value result = ResultOf(callee, arguments, {file.id, expr});
  if (frame != kNoFrame) {
    for (const TypeId id : types_.CopyOf(result.set)) {
      if (types_[id].kind != TypeKind::kSuper || children.size() > 1) continue;
      const FrameId own = FrameFor(file, file.ScopeAround(expr), frame);
      if (own != kNoFrame && !frames_[own].parameters.empty() && frames_[own].parameters[0].IsKnown() &&
          functions_[frames_[own].function].cls == types_[id].a)
        return Just(types_.Add(TypeKind::kSuper, types_[id].a, 0, {frames_[own].parameters[0].set}));
    }
  }
  return result;
}

Value Inference::Operate(Value left, Value right, Text method, Text reflected) {
  Value value{kNoTypes, static_cast<uint8_t>(left.doubt | right.doubt)};
  if (IsInVain(value)) return kUnknownValue;
  // What a power of integers is depends on the exponent.
  const Value plain_right = method == "__pow__" ? right : WithoutLiterals(right);
  for (const TypeId id : types_.CopyOf(WithoutLiterals(left).set)) {
    if (types_[id].kind == TypeKind::kForeign) {
      value.doubt |= Value::kOpen;
      continue;
    }
    if (types_[id].kind == TypeKind::kNone && types_.SizeOf(left.set) > 1) continue;
    const ClassId cls = ClassOfType(id);
    const auto member = FindMember(cls, method);
    Value result;
    if (member) {
      std::vector<Argument> arguments(1);
      arguments[0].value = plain_right;
      arguments[0].is_evaluated = true;
      const Value callee = ValueOfMember(*member, method, id, false);
      // Where what is stated does not take the right operand, that has its own say.
      bool fits = true;
      for (const TypeId function : types_.CopyOf(callee.set)) {
        if (types_[function].kind != TypeKind::kFunction) continue;
        Solution solution;
        fits = MatchArguments(types_[function].a, types_[function].args_count > 0, arguments, solution, nullptr) > 0;
        if (fits) break;
      }
      if (fits) result = ResultOf(callee, arguments);
    }
    if (!result.IsKnown()) result = CallMethod(plain_right, reflected, {Just(id)});
    value.set = types_.Union(value.set, result.set);
    value.doubt |= result.doubt;
  }
  // Stubs leave open what a power of numbers is whose sign is not known.
  if (!value.IsKnown() && method == "__pow__") {
    const TypeSetId integer = InstanceNamed("builtins", "int").set, real = InstanceNamed("builtins", "float").set;
    const TypeSetId base = WithoutLiterals(left).set, exponent = WithoutLiterals(right).set;
    if ((base == integer || base == real) && (exponent == integer || exponent == real))
      return {base == integer && exponent == integer ? integer : real, Value::kOpen | Value::kGuessed};
  }
  if (!left.IsKnown() && right.IsKnown()) {
    const Value result = CallMethod(plain_right, reflected, {kUnknownValue});
    value = {result.set, static_cast<uint8_t>(Value::kOpen | Value::kGuessed)};
  }
  if (!value.IsKnown()) value.doubt |= Value::kOpen;
  return value;
}

Value Inference::EvaluateBinary(const SourceFile& file, ExprId expr, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const Value left = ValueOf(file.id, syntax.ChildOf(expr, 0), frame);
  if (IsInVain(left)) return kUnknownValue;
  const Value right = ValueOf(file.id, syntax.ChildOf(expr, 1), frame);
  const uint8_t op = syntax[expr].op;
  if (op == CodeOfText("|")) {
    // `X | None` of types.
    const auto is_type = [&](Value value) {
      for (const TypeId id : types_.CopyOf(value.set)) {
        const TypeKind kind = types_[id].kind;
        if (kind == TypeKind::kClass || kind == TypeKind::kTypeForm || kind == TypeKind::kTypeVar ||
            kind == TypeKind::kSpecial)
          return true;
      }
      return false;
    };
    if (is_type(left) || is_type(right)) {
      const Value both = types_.Union(HintOfValue(left), HintOfValue(right));
      return both.IsKnown() ? Just(types_.Add(TypeKind::kTypeForm, 0, 0, {both.set}), both.doubt) : kUnknownValue;
    }
  }
  // Tuples of known length.
  if (op == CodeOfText("+") && types_.SizeOf(left.set) == 1 && types_.SizeOf(right.set) == 1) {
    const TypeId a = types_.TypesOf(left.set)[0], b = types_.TypesOf(right.set)[0];
    if (types_[a].kind == TypeKind::kTuple && types_[b].kind == TypeKind::kTuple) {
      std::vector<TypeSetId> items(types_.ArgsOf(a).begin(), types_.ArgsOf(a).end());
      items.insert(items.end(), types_.ArgsOf(b).begin(), types_.ArgsOf(b).end());
      return Just(types_.Add(TypeKind::kTuple, 0, 0, items));
    }
  }
  if (file.is_python2 && op == CodeOfText("/")) {
    const Value divided = Operate(left, right, "__div__", "__rdiv__");
    if (divided.IsKnown()) return divided;
  }
  for (const OperatorRow& row : kOperators)
    if (CodeOfText(row.text) == op) return Operate(left, right, row.method, row.reflected);
  return kUnknownValue;
}

// Lists and dictionaries of which it is no longer known what they hold where.
Value Inference::WithoutDisplay(Value value) {
  std::vector<TypeId> plain;
  for (const TypeId id : types_.CopyOf(value.set)) {
    const std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
    const Text literal = LiteralOf(types_[id]);
    plain.push_back(literal.starts_with('@') || literal.starts_with('#') ? InstanceOf(types_[id].a, args) : id);
  }
  return {types_.SetOf(plain), value.doubt};
}

Value Inference::WithoutNone(Value value) {
  std::vector<TypeId> rest;
  for (const TypeId id : types_.CopyOf(value.set))
    if (types_[id].kind != TypeKind::kNone) rest.push_back(id);
  return {types_.SetOf(rest), value.doubt};
}

// What a value is where it is taken for true, or for false.
Value Inference::WithoutFalse(Value value, bool keeps_false) {
  std::vector<TypeId> rest;
  for (const TypeId id : types_.CopyOf(value.set)) {
    const Type t = types_[id];
    bool is_surely_true = t.kind == TypeKind::kModule || t.kind == TypeKind::kClass || t.kind == TypeKind::kFunction;
    bool is_surely_false = t.kind == TypeKind::kNone;
    const Text literal = LiteralOf(t);
    if (literal.starts_with('^')) is_surely_true = true;
    if (t.kind == TypeKind::kInstance && !literal.empty() && !literal.starts_with('@') && !literal.starts_with('#') &&
        !literal.starts_with('^') && !classes_[t.a].is_enum) {
      const bool is_false = literal == "False" || literal == "0" || literal == "''" || literal == "\"\"";
      (is_false ? is_surely_false : is_surely_true) = true;
    }
    if (keeps_false ? is_surely_true : is_surely_false) continue;
    rest.push_back(id);
  }
  return {types_.SetOf(rest), value.doubt};
}

}  // namespace quillet
