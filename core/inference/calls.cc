// Calls: which argument each parameter gets, what type variables become, what comes out.
#include <algorithm>

#include "inference/inference.h"

namespace quillet {

std::vector<Argument> Inference::ArgumentsOf(const SourceFile& file, std::span<const ExprId> exprs, FrameId frame) {
  std::vector<Argument> arguments;
  arguments.reserve(exprs.size());
  for (const ExprId expr : exprs) {
    Argument argument;
    argument.frame = frame;
    argument.place = {file.id, expr};
    switch (file.syntax[expr].kind) {
      case ExprKind::kKeyword:
        argument.kind = Argument::kKeyword;
        argument.name = file.syntax.NameOf(expr);
        argument.place.expr = file.syntax.ChildOf(expr, 0);
        break;
      case ExprKind::kStarred: {
        argument.place.expr = file.syntax.ChildOf(expr, 0);
        const Value items = ValueOf(file.id, argument.place.expr, frame);
        // A tuple of known length gives so many arguments.
        if (types_.SizeOf(items.set) == 1 && types_[types_.TypesOf(items.set)[0]].kind == TypeKind::kTuple) {
          const TypeId tuple = types_.TypesOf(items.set)[0];
          for (size_t i = 0; i < types_[tuple].args_count; ++i) {
            Argument item;
            item.value = {types_.ArgOf(tuple, i), 0};
            item.is_evaluated = true;
            arguments.push_back(std::move(item));
          }
          continue;
        }
        argument.kind = Argument::kStar;
        argument.value = IterationOf(items);
        argument.is_evaluated = true;
        break;
      }
      case ExprKind::kDoubleStarred: {
        argument.kind = Argument::kDoubleStar;
        argument.place.expr = file.syntax.ChildOf(expr, 0);
        const Value items = ValueOf(file.id, argument.place.expr, frame);
        const std::vector<std::pair<Text, Value>> entries = types_.SizeOf(items.set) == 1
                                                                ? EntriesOf(types_.TypesOf(items.set)[0])
                                                                : std::vector<std::pair<Text, Value>>();
        for (const auto& [name, value] : entries) {
          Argument item;
          item.kind = Argument::kKeyword;
          item.name = name;
          item.value = value;
          item.is_evaluated = true;
          arguments.push_back(std::move(item));
        }
        if (!entries.empty()) continue;
        break;
      }
      default:
        break;
    }
    arguments.push_back(std::move(argument));
  }
  return arguments;
}

Value Inference::ValueOfArgument(Argument& argument) {
  if (!argument.is_evaluated) {
    argument.value = argument.place.expr == kNoExpr ? kUnknownValue
                                                    : ValueOf(argument.place.file, argument.place.expr, argument.frame);
    argument.is_evaluated = true;
  }
  return argument.value;
}

// The arguments of a type seen as one of its bases: what a `list[int]` is as an Iterable.
TypeSetId Inference::ArgsAs(TypeId type, ClassId base, size_t index) {
  const Type t = types_[type];
  Solution own;
  ClassId cls = t.a;
  if (t.kind == TypeKind::kTuple) {
    cls = ClassNamed("builtins", "tuple");
    if (cls == kNoId) return kNoTypes;
    TypeSetId items = kNoTypes;
    for (size_t i = 0; i < t.args_count; ++i) items = types_.Union(items, types_.ArgOf(type, i));
    for (const TypeId parameter : InfoOf(cls).parameters) own.emplace_back(parameter, items);
  } else {
    const std::vector<TypeId> parameters = InfoOf(cls).parameters;
    for (size_t i = 0; i < parameters.size(); ++i) own.emplace_back(parameters[i], types_.ArgOf(type, i));
  }
  const std::vector<BaseClass> order = InfoOf(cls).order;
  for (const BaseClass& entry : order)
    if (entry.cls == base && index < entry.args.size()) return Substitute({entry.args[index], 0}, own).Packed();
  return kNoTypes;
}

void Inference::Solve(TypeSetId hint, TypeSetId value, Solution& solution, int depth) {
  static constexpr int kMaxNesting = 6;
  if (depth > kMaxNesting || WithoutOpen(hint) == kNoTypes || WithoutOpen(value) == kNoTypes) return;
  const TypeList hints = types_.CopyOf(hint);
  std::vector<TypeId> variables;
  std::vector<TypeId> taken;
  for (const TypeId h : hints) {
    const Type t = types_[h];
    if (t.kind == TypeKind::kTypeVar ||
        (t.kind == TypeKind::kSpecial && t.a == static_cast<uint32_t>(SpecialForm::kSelf))) {
      variables.push_back(h);
      continue;
    }
    for (const TypeId v : types_.CopyOf(value)) {
      const Type given = types_[v];
      if (h == v) {
        taken.push_back(v);
        continue;
      }
      switch (t.kind) {
        case TypeKind::kInstance: {
          if (given.kind == TypeKind::kClass && classes_[t.a].name == "type" && t.args_count == 1) {
            const std::vector<TypeSetId> args(types_.ArgsOf(v).begin(), types_.ArgsOf(v).end());
            Solve(types_.ArgOf(h, 0), types_.SetOf(InstanceOf(given.a, args)), solution, depth + 1);
            taken.push_back(v);
            break;
          }
          const ClassId cls = ClassOfType(v);
          if (cls == kNoId) break;
          if (IsSubclass(cls, t.a)) {
            taken.push_back(v);
            if (given.kind == TypeKind::kInstance || given.kind == TypeKind::kTuple)
              for (size_t i = 0; i < t.args_count; ++i)
                Solve(types_.ArgOf(h, i), ArgsAs(v, t.a, i), solution, depth + 1);
            if (given.kind == TypeKind::kClass && classes_[cls].is_enum) break;
          } else if (InfoOf(t.a).is_protocol && t.args_count > 0) {
            // A protocol that is not named as a base: what its methods give is what those of the value give.
            const ClassId protocol = t.a;
            const std::vector<TypeId> parameters = InfoOf(protocol).parameters;

            const std::unordered_map<Text, uint32_t> symbols = MembersOf(protocol).symbols;
            const SourceFile* file = FileOf(classes_[protocol].file);
            for (const auto& [name, symbol] : symbols) {
              const auto own = FindMember(cls, name);
              if (!own || file == nullptr) continue;
              const Value stated = ValueOfVariable(*file, symbol, kNoFrame);
              for (const TypeId function : types_.CopyOf(stated.set)) {
                if (types_[function].kind != TypeKind::kFunction) continue;
                const Value result = ResultIn(types_[function].a, kNoFrame);
                std::vector<Argument> none;
                const Value found = AttributeOfType(v, name);
                // Called as the protocol has it.
                const FunctionInfo stated_info = functions_[types_[function].a];
                const auto stated_parameters = ParametersOf(stated_info);
                for (size_t i = 1; i < stated_parameters.size(); ++i) {
                  if (file->syntax[stated_parameters[i]].op != static_cast<uint8_t>(ParameterKind::kPlain) ||
                      file->syntax.ChildOf(stated_parameters[i], 1) != kNoExpr)
                    continue;
                  const ExprId stated_hint = HintOfParameter(*file, stated_info, i);
                  Argument argument;
                  argument.value = stated_hint == kNoExpr
                                       ? kUnknownValue
                                       : Substitute(ValueOfHint(stated_info.file, stated_hint), solution, true);
                  argument.is_evaluated = true;
                  none.push_back(std::move(argument));
                }
                Solution inner;
                Solve(result.set, ResultOf(found, none).Packed(), inner, depth + 2);
                for (const auto& [variable, solved] : inner)
                  for (size_t i = 0; i < parameters.size(); ++i)
                    if (parameters[i] == variable) Solve(types_.ArgOf(h, i), solved, solution, depth + 1);
              }
            }
            taken.push_back(v);
          }
          break;
        }
        case TypeKind::kTuple: {
          taken.push_back(v);
          for (size_t i = 0; i < t.args_count; ++i)
            Solve(types_.ArgOf(h, i),
                  given.kind == TypeKind::kTuple ? types_.ArgOf(v, i) : IterationOf(Just(v)).Packed(), solution,
                  depth + 1);
          break;
        }
        case TypeKind::kCallable: {
          taken.push_back(v);
          std::vector<Argument> arguments;
          for (size_t i = 1; i < t.args_count; ++i) {
            Argument argument;
            argument.value = Substitute({types_.ArgOf(h, i), 0}, solution, true);
            argument.is_evaluated = true;
            arguments.push_back(std::move(argument));
          }
          // Parameters that a function states may say what the variables are.
          if (given.kind == TypeKind::kFunction) {
            const FunctionInfo info = functions_[given.a];
            const auto parameters = ParametersOf(info);
            const SourceFile* file = FileOf(info.file);
            for (size_t i = 1; i < t.args_count; ++i) {
              const size_t at = i - 1 + (given.args_count > 0 ? 1 : 0);
              if (at >= parameters.size()) break;
              const ExprId own = HintOfParameter(*file, info, at);
              if (own == kNoExpr) continue;
              const Value stated = ValueOfHint(info.file, own);
              std::vector<TypeId> variables_of_it;
              CollectTypeVars(stated.set, variables_of_it);
              if (variables_of_it.empty()) Solve(types_.ArgOf(h, i), stated.Packed(), solution, depth + 1);
            }
          }
          if (t.b == 0 && given.kind == TypeKind::kFunction) {
            Solve(types_.ArgOf(h, 0), ResultIn(given.a, given.b).Packed(), solution, depth + 1);
          } else {
            Solve(types_.ArgOf(h, 0), ResultOf(Just(v), arguments).Packed(), solution, depth + 1);
          }
          break;
        }
        default:
          break;
      }
    }
  }
  if (variables.empty()) return;
  // A variable gets what no other alternative takes.
  std::vector<TypeId> rest;
  for (const TypeId v : types_.CopyOf(value))
    if (std::ranges::find(taken, v) == taken.end()) rest.push_back(v);
  if (rest.empty() && hints.size() > 1) return;
  const TypeSetId solved =
      WithoutLiterals({(rest.empty() ? value : types_.SetOf(rest)) | (value & kOpenSet), 0}).Packed();
  for (const TypeId variable : variables) {
    const auto known = std::ranges::find(solution, variable, &std::pair<TypeId, TypeSetId>::first);
    if (known == solution.end()) {
      solution.emplace_back(variable, solved);
    } else {
      known->second = types_.Union(known->second, solved);
    }
  }
}

Value Inference::Substitute(Value value, const Solution& solution, bool drops_unsolved, int depth) {
  static constexpr int kMaxNesting = 8;
  if (depth > kMaxNesting || (solution.empty() && !drops_unsolved)) return value;
  Value result{kNoTypes, value.doubt};
  bool has_changed = false;
  for (const TypeId id : types_.CopyOf(value.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kTypeVar ||
        (t.kind == TypeKind::kSpecial && t.a == static_cast<uint32_t>(SpecialForm::kSelf))) {
      const auto known = std::ranges::find(solution, id, &std::pair<TypeId, TypeSetId>::first);
      if (known != solution.end()) {
        has_changed = true;
        result.set = types_.Union(result.set, known->second);
        if (WithoutOpen(known->second) == kNoTypes) result.doubt |= Value::kOpen;
        continue;
      }
      if (drops_unsolved) {
        has_changed = true;
        result.doubt |= Value::kOpen;
        continue;
      }
    } else if (t.args_count > 0 && t.kind != TypeKind::kFunction && t.kind != TypeKind::kSuper) {
      std::vector<TypeSetId> args;
      bool has_other = false;
      for (size_t i = 0; i < t.args_count; ++i) {
        const TypeSetId arg = types_.ArgOf(id, i);
        // The variables of a callable are those of its calls.
        const bool drops = drops_unsolved && t.kind != TypeKind::kCallable;
        args.push_back(Substitute({arg, 0}, solution, drops, depth + 1).Packed());
        has_other = has_other || args.back() != arg;
      }
      if (has_other) {
        has_changed = true;
        // type[X] of a class is that class.
        if (t.kind == TypeKind::kInstance && classes_[t.a].name == "type" && args.size() == 1) {
          bool is_class = false;
          for (const TypeId inner : types_.CopyOf(args[0])) {
            if (types_[inner].kind != TypeKind::kInstance) continue;
            is_class = true;
            result.set = types_.Union(result.set, types_.SetOf(types_.Add(TypeKind::kClass, types_[inner].a)));
          }
          if (is_class) continue;
        }
        result.set = types_.Union(result.set, types_.SetOf(types_.Add(t.kind, t.a, t.b, args)));
        continue;
      }
    }
    result.set = types_.Union(result.set, types_.SetOf(id));
  }
  return has_changed ? Value{result.set, result.doubt} : value;
}

// How well a value fits a hint: 0 not at all, 1 perhaps, 2 surely.
int Inference::Assignable(TypeSetId hint, Value value, int depth) {
  static constexpr int kMaxNesting = 3;
  if (WithoutOpen(hint) == kNoTypes || !value.IsKnown() || depth > kMaxNesting) return 1;
  int worst = 2;
  const TypeList values = types_.CopyOf(value.set);
  for (const TypeId v : values) {
    // What may be None is taken for what it is otherwise.
    if (types_[v].kind == TypeKind::kNone && values.size() > 1) {
      worst = std::min(worst, 1);
      continue;
    }
    int best = 0;
    for (const TypeId h : types_.CopyOf(hint)) {
      if (best == 2) break;
      if (h == v) {
        best = 2;
        break;
      }
      const Type t = types_[h], given = types_[v];
      switch (t.kind) {
        case TypeKind::kTypeVar:
          best = std::max(best, 2);
          break;
        case TypeKind::kSpecial:
          best = std::max(best, 1);
          break;
        case TypeKind::kNone:
          break;
        case TypeKind::kCallable:
          if (given.kind == TypeKind::kFunction || given.kind == TypeKind::kCallable || given.kind == TypeKind::kClass)
            best = 2;
          if (given.kind == TypeKind::kInstance && FindMember(given.a, "__call__")) best = 2;
          break;
        case TypeKind::kTuple:
          if (given.kind == TypeKind::kTuple && given.args_count == t.args_count) {
            best = 2;
            for (size_t i = 0; i < t.args_count; ++i)
              best = std::min(best, Assignable(types_.ArgOf(h, i), {types_.ArgOf(v, i), 0}, depth + 1));
          } else if (given.kind == TypeKind::kInstance && given.a == ClassNamed("builtins", "tuple")) {
            best = std::max(best, 1);
          }
          break;
        case TypeKind::kClass:
          if (given.kind == TypeKind::kClass && IsSubclass(given.a, t.a)) best = 2;
          break;
        case TypeKind::kInstance: {
          if (t.b != 0 && given.b != t.b) {  // another literal
            if (given.b == 0 && given.kind == TypeKind::kInstance && given.a == t.a) best = std::max(best, 1);
            break;
          }
          if (given.kind == TypeKind::kClass && classes_[t.a].name == "type") {
            best = t.args_count == 0 ? 2 : Assignable(types_.ArgOf(h, 0), Just(InstanceOf(given.a)), depth + 1);
            break;
          }
          const ClassId cls = ClassOfType(v);
          if (cls == kNoId) {
            best = std::max(best, 1);
            break;
          }
          if (IsSubclass(cls, t.a)) {
            best = 2;
            if (t.a == ClassNamed("builtins", "object")) best = 2;
            for (size_t i = 0;
                 i < t.args_count && best > 0 && (given.kind == TypeKind::kInstance || given.kind == TypeKind::kTuple);
                 ++i)
              best = std::min(best, Assignable(types_.ArgOf(h, i), {ArgsAs(v, t.a, i), 0}, depth + 1));
            break;
          }
          const Text name = classes_[t.a].name, own = classes_[cls].name;
          if ((name == "float" && own == "int") || (name == "complex" && (own == "int" || own == "float"))) best = 2;
          if (InfoOf(cls).is_open) best = std::max(best, 1);
          if (InfoOf(t.a).is_protocol) {
            const std::unordered_map<Text, uint32_t> symbols = MembersOf(t.a).symbols;
            bool has_all = true;
            for (const auto& [member, symbol] : symbols)
              if (member != "__slots__" && member != "__class_getitem__" && !FindMember(cls, member)) has_all = false;
            if (has_all && !symbols.empty()) best = 2;
          }
          break;
        }
        default:
          best = std::max(best, 1);
      }
    }
    worst = std::min(worst, best);
  }
  return worst;
}

int Inference::MatchArguments(FunctionId id, bool is_bound, std::vector<Argument>& arguments, Solution& solution,
                              std::vector<Value>* values) {
  const FunctionInfo info = functions_[id];
  const SourceFile* file = FileOf(info.file);
  const FileSyntax& syntax = file->syntax;
  const std::vector<ExprId> parameters(ParametersOf(info).begin(), ParametersOf(info).end());
  std::vector<Value> given(parameters.size());
  std::vector<bool> is_given(parameters.size(), false);
  int score = 2;
  bool fits = true;
  const auto kind_of = [&](size_t i) { return static_cast<ParameterKind>(syntax[parameters[i]].op); };
  const auto give = [&](size_t i, Value value, bool is_many) {
    is_given[i] = true;
    given[i] = is_many ? types_.Union(given[i], value) : value;
    const ExprId hint = HintOfParameter(*file, info, i);
    if (hint == kNoExpr) return;
    const Value stated = ValueOfHint(info.file, hint);
    score = std::min(score, Assignable(stated.set, value));
    Solve(stated.set, value.Packed(), solution);
  };
  size_t next = is_bound ? 1 : 0;
  if (is_bound && !parameters.empty() && kind_of(0) == ParameterKind::kStar) next = 0;
  if (is_bound && !parameters.empty()) is_given[0] = true;
  bool has_star = false, has_double_star = false;
  for (Argument& argument : arguments) {
    if (argument.kind == Argument::kPlain || argument.kind == Argument::kStar) {
      if (argument.kind == Argument::kStar) has_star = true;
      do {
        while (next < parameters.size() && kind_of(next) == ParameterKind::kSlash) ++next;
        if (next >= parameters.size() || kind_of(next) == ParameterKind::kBareStar ||
            kind_of(next) == ParameterKind::kDoubleStar) {
          if (argument.kind == Argument::kPlain && !has_star) fits = false;  // too many
          break;
        }
        const bool is_rest = kind_of(next) == ParameterKind::kStar;
        give(next, ValueOfArgument(argument), is_rest);
        if (is_rest) break;
        ++next;
      } while (argument.kind == Argument::kStar);
    } else if (argument.kind == Argument::kKeyword) {
      bool is_found = false;
      for (size_t i = 0; i < parameters.size() && !is_found; ++i) {
        if (kind_of(i) != ParameterKind::kPlain || syntax.NameOf(parameters[i]) != argument.name) continue;
        give(i, ValueOfArgument(argument), false);
        is_found = true;
      }
      for (size_t i = 0; i < parameters.size() && !is_found; ++i) {
        if (kind_of(i) != ParameterKind::kDoubleStar) continue;
        give(i, ValueOfArgument(argument), true);
        is_found = true;
      }
      if (!is_found) fits = false;
    } else {
      has_double_star = true;
    }
  }
  for (size_t i = 0; i < parameters.size(); ++i) {
    if (is_given[i] || kind_of(i) != ParameterKind::kPlain || syntax.ChildOf(parameters[i], 1) != kNoExpr) continue;
    if (!has_star && !has_double_star) fits = false;  // one is missing
    score = std::min(score, 1);
  }
  if (values != nullptr) {
    for (size_t i = 0; i < parameters.size(); ++i) {
      if (kind_of(i) == ParameterKind::kStar && is_given[i]) {
        // Each in its place, where there are few.
        std::vector<TypeSetId> items;
        size_t position = is_bound ? 1 : 0;
        bool is_exact = true;
        for (Argument& argument : arguments) {
          if (argument.kind == Argument::kStar) is_exact = false;
          if (argument.kind != Argument::kPlain) continue;
          if (position++ >= i) items.push_back(ValueOfArgument(argument).Packed());
        }
        given[i] = is_exact ? Just(types_.Add(TypeKind::kTuple, 0, 0, items))
                            : InstanceNamed("builtins", "tuple", {given[i].Packed()});
      } else if (kind_of(i) == ParameterKind::kDoubleStar && is_given[i]) {
        // What each keyword was given is remembered by its name.
        std::vector<std::pair<Text, Value>> entries;
        for (Argument& argument : arguments) {
          if (argument.kind != Argument::kKeyword) continue;
          const bool is_own = std::ranges::any_of(parameters, [&](ExprId parameter) {
            return syntax[parameter].op == static_cast<uint8_t>(ParameterKind::kPlain) &&
                   syntax.NameOf(parameter) == argument.name;
          });
          if (is_own) continue;
          entries.emplace_back(argument.name, ValueOfArgument(argument));
        }
        const ClassId dict = ClassNamed("builtins", "dict");
        const TypeSetId args[] = {InstanceNamed("builtins", "str").set, given[i].Packed()};
        given[i] = dict == kNoId
                       ? kUnknownValue
                       : Just(types_.Add(TypeKind::kInstance, dict, LiteralNumber(TextOfEntries(entries)), args));
      } else if (!is_given[i] && kind_of(i) == ParameterKind::kPlain && syntax.ChildOf(parameters[i], 1) != kNoExpr) {
        given[i] = ValueOf(info.file, syntax.ChildOf(parameters[i], 1));
      }
    }
    *values = std::move(given);
  }
  return fits ? score : -1;
}

Value Inference::ResultOfFunctionCall(TypeId callee, std::vector<Argument>& arguments) {
  const Type t = types_[callee];
  const FunctionId id = t.a;
  const bool is_bound = t.args_count > 0;
  const TypeSetId receiver = types_.ArgOf(callee, 0);
  Solution solution;
  std::vector<Value> values;
  const FunctionInfo info = functions_[id];
  if (is_bound) {
    const auto parameters = ParametersOf(info);
    const SourceFile* file = FileOf(info.file);
    if (!parameters.empty()) {
      const ExprId hint = HintOfParameter(*file, info, 0);
      if (hint != kNoExpr) Solve(ValueOfHint(info.file, hint).set, receiver, solution);
    }
    for (const TypeId self : types_.CopyOf(receiver)) {
      const ClassId cls = types_[self].kind == TypeKind::kClass ? types_[self].a : ClassOfType(self);
      if (cls == kNoId || info.cls == kNoId) continue;
      const auto& order = InfoOf(cls).order;
      for (const BaseClass& entry : order) {
        if (entry.cls != info.cls) continue;
        Member member;
        member.owner = entry.cls;
        member.args = entry.args;
        for (const auto& pair : SolutionFor(member, self)) {
          const auto known = std::ranges::find(solution, pair.first, &std::pair<TypeId, TypeSetId>::first);
          if (WithoutOpen(pair.second) == kNoTypes) continue;
          if (known == solution.end()) {
            solution.push_back(pair);
          }
        }
        break;
      }
    }
  }
  // `object.__new__(cls)` gives an instance of what it is given.
  if (!is_bound && (info.flags & kIsStatic) != 0 && info.cls != kNoId && info.lambda == kNoExpr && !arguments.empty() &&
      FileOf(info.file)->syntax.NameOf(FileOf(info.file)->syntax.stmt(info.stmt)) == "__new__") {
    TypeSetId made = kNoTypes;
    for (const TypeId cls : types_.CopyOf(ValueOfArgument(arguments[0]).set))
      if (types_[cls].kind == TypeKind::kClass) made = types_.Union(made, types_.SetOf(InstanceOf(types_[cls].a)));
    if (made != kNoTypes)
      solution.emplace_back(types_.Add(TypeKind::kSpecial, static_cast<uint32_t>(SpecialForm::kSelf)), made);
  }
  const int score = MatchArguments(id, is_bound, arguments, solution, &values);
  if (is_bound && !values.empty()) values[0] = {receiver, 0};
  bool is_stated = false;
  const Value stated = StatedResult(id, kNoFrame, is_stated);
  if (is_stated && (stated.IsKnown() || (stated.doubt & Value::kOpen) == 0)) {
    return Substitute(stated, solution, true);
  }
  const FrameId frame = FrameOf(id, t.b, values);
  Value result = ResultIn(id, frame != kNoFrame ? frame : t.b);
  if (score < 0) result.doubt |= Value::kOpen;
  return Substitute(result, solution);
}

Value Inference::ResultOfClassCall(TypeId callee, std::vector<Argument>& arguments, ExprPlace place) {
  const Type t = types_[callee];
  const ClassId cls = t.a;
  ClassInfo& info = InfoOf(cls);
  bool is_special = false;
  const Value special = ResultOfSpecialCall(callee, arguments, place, is_special);
  if (is_special) return special;
  // A metaclass that calls otherwise, and `__new__` that makes something else.
  if (info.metaclass != kNoId && !info.is_enum) {
    const auto call = FindMember(info.metaclass, "__call__");
    if (call && call->owner != ClassNamed("builtins", "type") && call->owner != ClassNamed("builtins", "object")) {
      const Value result =
          ResultOf(Bound(RawValueOfMember(*call, "__call__"), callee, false, call->owner), arguments, place);
      if (result.IsKnown()) return result;
    }
  }
  if (info.is_enum) return Just(InstanceOf(cls));
  if (!info.parameters.empty() && t.args_count == 0) {
    Solution solution;
    bool is_solved = false;
    Value made_otherwise;  // by a `__new__` that gives something else
    for (const Text name : {Text("__init__"), Text("__new__")}) {
      const auto constructor = FindMember(cls, name);
      if (!constructor || is_solved) continue;
      Value raw = RawValueOfMember(*constructor, name);
      // The receiver is an instance whose arguments are its own variables.
      int best = -1;
      Solution found;
      for (const TypeId function : types_.CopyOf(raw.set)) {
        if (types_[function].kind != TypeKind::kFunction) continue;
        Solution own;
        const int score = MatchArguments(types_[function].a, true, arguments, own, nullptr);
        if (score <= best) continue;
        made_otherwise = kUnknownValue;
        // What the constructor says of `self` settles variables as well: `self: dict[str, V]`.
        const FunctionInfo made = functions_[types_[function].a];
        const auto parameters = ParametersOf(made);
        // And what `__new__` says that it makes: `zip[tuple[T, S]]`.
        const FileSyntax& syntax = FileOf(made.file)->syntax;
        const ExprId hint = name == "__new__"    ? syntax.stmt(made.stmt).hint
                            : parameters.empty() ? kNoExpr
                                                 : HintOfParameter(*FileOf(made.file), made, 0);
        if (hint != kNoExpr && syntax[hint].kind != ExprKind::kSignatureHint) {
          const Value said = ValueOfHint(made.file, hint);
          bool is_own = !said.IsKnown();
          for (const TypeId self : types_.CopyOf(said.set)) {
            is_own = is_own || types_[self].kind == TypeKind::kSpecial ||
                     (types_[self].kind == TypeKind::kInstance && types_[self].a == cls);
            if (types_[self].kind != TypeKind::kInstance || types_[self].a != cls) continue;
            const std::vector<TypeId> variables = info.parameters;
            for (size_t i = 0; i < variables.size(); ++i) {
              const TypeSetId arg = types_.ArgOf(self, i);
              const TypeSetId solved = Substitute({arg, 0}, own, true).Packed();
              if (WithoutOpen(solved) != kNoTypes) {
                std::erase_if(own, [&](const auto& pair) { return pair.first == variables[i]; });
                own.emplace_back(variables[i], solved);
              }
            }
          }
          if (name == "__new__" && !is_own) made_otherwise = Substitute(said, own, true);
        }
        best = score;
        found = own;
      }
      if (best < 0) continue;
      if (made_otherwise.IsKnown()) return made_otherwise;
      // In terms of the class's own variables, where the constructor is a base's.
      for (size_t i = 0; i < constructor->args.size(); ++i) {
        const ClassInfo& owner = InfoOf(constructor->owner);
        if (constructor->owner == cls || i >= owner.parameters.size()) continue;
        for (const auto& [variable, solved] : Solution(found))
          if (variable == owner.parameters[i]) Solve(constructor->args[i], solved, found);
      }
      solution = found;
      is_solved = !found.empty();
    }
    if (!is_solved) SolveByFields(cls, arguments, solution);
    std::vector<TypeSetId> args;
    const std::vector<TypeId> variables = info.parameters;
    for (const TypeId variable : variables) {
      const auto known = std::ranges::find(solution, variable, &std::pair<TypeId, TypeSetId>::first);
      args.push_back(known == solution.end() ? kNoTypes : known->second);
    }
    return Just(InstanceOf(cls, args));
  }
  if (const auto maker = FindMember(cls, "__new__"); maker && maker->owner != ClassNamed("builtins", "object")) {
    const SourceFile* file = FileOf(classes_[maker->owner].file);
    if (file != nullptr && !file->is_stub) {
      const Value raw = RawValueOfMember(*maker, "__new__");
      Value made;
      for (const TypeId function : types_.CopyOf(raw.set)) {
        if (types_[function].kind != TypeKind::kFunction) continue;
        const Value result = ResultOfFunctionCall(
            types_.Add(TypeKind::kFunction, types_[function].a, types_[function].b, {types_.SetOf(callee)}), arguments);
        made = types_.Union(made, result);
      }
      // What makes one of the class, or says no more than that of a class above, makes what is called.
      bool is_instance = false, is_own = false;
      for (const TypeId id : types_.CopyOf(made.set)) {
        if (types_[id].kind != TypeKind::kInstance) continue;
        is_instance = true;
        is_own = is_own || IsSubclass(cls, types_[id].a);
      }
      if (is_instance && !is_own && (made.doubt & Value::kOpen) == 0) return made;
    }
  }
  const std::vector<TypeSetId> args(types_.ArgsOf(callee).begin(), types_.ArgsOf(callee).end());
  if (const uint32_t fields = info.is_named_tuple ? FieldsGiven(cls, arguments) : 0; fields != 0)
    return Just(types_.Add(TypeKind::kInstance, cls, fields, args));
  return Just(InstanceOf(cls, args));
}

// What a named tuple whose fields say nothing themselves is made of, as a literal; 0 where that is not plain.
uint32_t Inference::FieldsGiven(ClassId cls, std::vector<Argument>& arguments) {
  const std::vector<MadeField> fields = MembersOf(cls).fields;
  for (const Text maker : {Text("__new__"), Text("__init__")})
    if (classes_[cls].symbols.contains(maker)) return 0;
  std::vector<std::pair<Text, Value>> entries;
  for (size_t i = 0; i < arguments.size(); ++i) {
    const Argument::Kind kind = arguments[i].kind;
    if (kind == Argument::kStar || kind == Argument::kDoubleStar) return 0;
    const auto field = kind == Argument::kPlain ? fields.begin() + static_cast<ptrdiff_t>(std::min(i, fields.size()))
                                                : std::ranges::find(fields, arguments[i].name, &MadeField::name);
    if (field == fields.end() || field->hint != kNoExpr || field->value != kNoExpr) return 0;
    const Value given = WithoutDisplay(WithoutLiterals(ValueOfArgument(arguments[i])));
    if (given.IsKnown()) entries.emplace_back(field->name, given);
  }
  return entries.empty() ? 0 : LiteralNumber(TextOfEntries(entries));
}

// What the fields of a dataclass or named tuple, which make its constructor, are given.
void Inference::SolveByFields(ClassId cls, std::vector<Argument>& arguments, Solution& solution) {
  const ClassInfo& info = MembersOf(cls);
  if (!info.is_dataclass && !info.is_named_tuple) return;
  const std::vector<MadeField> fields = info.fields;
  const FileId file = info.file;
  for (size_t i = 0; i < arguments.size(); ++i) {
    const Argument::Kind kind = arguments[i].kind;
    if (kind == Argument::kStar || kind == Argument::kDoubleStar) return;
    auto field = kind == Argument::kPlain ? fields.begin() + static_cast<ptrdiff_t>(std::min(i, fields.size()))
                                          : std::ranges::find(fields, arguments[i].name, &MadeField::name);
    if (field == fields.end() || field->hint == kNoExpr) continue;
    Solve(ValueOfHint(file, field->hint).set, ValueOfArgument(arguments[i]).Packed(), solution);
  }
}

Value Inference::RawValueOfMember(const Member& member, Text) {
  if (member.symbol == kNoIndex) return kUnknownValue;
  const SourceFile* file = FileOf(classes_[member.owner].file);
  return file == nullptr ? kUnknownValue : ValueOfVariable(*file, member.symbol, kNoFrame);
}

// What the language and its library do that no stub says.
Value Inference::ResultOfSpecialCall(TypeId callee, std::vector<Argument>& arguments, ExprPlace place,
                                     bool& is_special) {
  const Type t = types_[callee];
  is_special = false;
  const auto at = [&](size_t i) { return i < arguments.size() ? ValueOfArgument(arguments[i]) : kUnknownValue; };
  const auto answer = [&](Value value) {
    is_special = true;
    return value;
  };
  const SourceFile* caller = place.file == kNoFile ? nullptr : FileOf(place.file);
  const bool has_call =
      caller != nullptr && place.expr != kNoExpr && caller->syntax[place.expr].kind == ExprKind::kCall;
  if (t.kind == TypeKind::kClass) {
    const ClassInfo& info = classes_[t.a];
    const SourceFile* file = FileOf(info.file);
    if (info.stmt == kModuleStmt || file == nullptr) return {};
    const Text name = info.name;
    static constexpr Text kNames[] = {
        "super", "type",    "TypeVar", "ParamSpec", "TypeVarTuple", "NewType",     "NamedTuple", "Enum", "IntEnum",
        "Flag",  "IntFlag", "StrEnum", "partial",   "staticmethod", "classmethod", "tuple",      "dict"};
    static constexpr Text kProperties[] = {"property", "abstractproperty", "DynamicClassAttribute"};
    const bool is_property = std::ranges::find(kProperties, name) != std::end(kProperties);
    if ((!is_property && std::ranges::find(kNames, name) == std::end(kNames)) || !file->is_stub) return {};
    if (name == "super") {
      if (arguments.size() >= 2) {
        for (const TypeId cls : types_.CopyOf(at(0).set))
          if (types_[cls].kind == TypeKind::kClass)
            return answer(Just(types_.Add(TypeKind::kSuper, types_[cls].a, 0, {at(1).set}), at(1).doubt));
        return answer(kUnknownValue);
      }
      if (caller == nullptr) return answer(kUnknownValue);
      uint32_t scope = caller->ScopeAt(caller->syntax[place.expr].begin);
      FunctionId method = kNoId;
      for (; scope != kNoIndex; scope = caller->bindings.scopes[scope].parent) {
        const FunctionId around = FunctionOfScope(*caller, scope);
        if (around != kNoId) method = around;
        if (around != kNoId && functions_[around].cls != kNoId) break;
      }
      if (method == kNoId || functions_[method].cls == kNoId) return answer(kUnknownValue);
      const Value self =
          ParametersOf(functions_[method]).empty() ? SelfOf(functions_[method]) : ValueOfParameter(method, 0, kNoFrame);
      return answer(Just(types_.Add(TypeKind::kSuper, functions_[method].cls, 0, {self.set})));
    }
    if (name == "type") {
      if (arguments.size() == 3 && has_call)
        return answer(Just(types_.Add(TypeKind::kClass, MadeClass(*caller, place.expr, "type"))));
      if (arguments.size() != 1) return {};
      Value value{kNoTypes, at(0).doubt};
      for (const TypeId id : types_.CopyOf(at(0).set)) {
        const ClassId cls = ClassOfType(id);
        if (cls != kNoId) value = types_.Union(value, Just(types_.Add(TypeKind::kClass, cls)));
      }
      return answer(value);
    }
    if (is_property) {
      const ClassId property = ClassNamed("builtins", "property");
      if (property == kNoId) return answer(kUnknownValue);
      TypeSetId getter = kNoTypes;
      if (!arguments.empty() && (arguments[0].kind == Argument::kPlain || arguments[0].name == "fget"))
        getter = at(0).set;
      return answer(Just(types_.Add(TypeKind::kInstance, property, 0, {getter})));
    }
    if (name == "staticmethod" || name == "classmethod") {
      // `f = staticmethod(f)`: it holds what it was given, and says when it is looked up what that is bound to.
      if (arguments.empty()) return answer(kUnknownValue);
      const ClassId holder = ClassNamed("builtins", name);
      const Value given = at(0);
      return holder == kNoId ? answer(given)
                             : answer(Just(types_.Add(TypeKind::kInstance, holder, 0, {given.set}), given.doubt));
    }
    if ((name == "TypeVar" || name == "ParamSpec" || name == "TypeVarTuple") && has_call)
      return answer(Just(types_.Add(TypeKind::kTypeVar, place.file, place.expr)));
    if (name == "NewType") return arguments.size() < 2 ? Value{} : answer(at(1));
    if (name == "NamedTuple" && has_call)
      return answer(Just(types_.Add(TypeKind::kClass, MadeClass(*caller, place.expr, "NamedTuple"))));
    if ((name == "Enum" || name == "IntEnum" || name == "Flag" || name == "IntFlag" || name == "StrEnum") && has_call &&
        arguments.size() >= 2)
      return answer(Just(types_.Add(TypeKind::kClass, MadeClass(*caller, place.expr, name))));
    if (name == "partial" && !arguments.empty()) {
      // What is left of a call: its result, whatever it will be given.
      std::vector<Argument> rest(arguments.begin() + 1, arguments.end());
      Argument open;
      open.kind = Argument::kStar;
      open.is_evaluated = true;
      open.value = kUnknownValue;
      rest.push_back(open);
      const Value result = ResultOf(at(0), rest);
      return answer(Just(types_.Add(TypeKind::kCallable, 0, 0, {result.Packed()})));
    }
    if (name == "dict" && !arguments.empty() && t.a == ClassNamed("builtins", "dict") && t.args_count == 0) {
      // Each keyword is remembered with what it was given, and so is what a dictionary known by its keys had.
      std::vector<std::pair<Text, Value>> entries;
      bool is_whole = true;
      const auto add = [&](Text key, Value value) {
        std::erase_if(entries, [&](const auto& entry) { return entry.first == key; });
        entries.emplace_back(key, value);
      };
      for (Argument& argument : arguments) {
        if (argument.kind == Argument::kKeyword) {
          add(argument.name, ValueOfArgument(argument));
          continue;
        }
        const Value given = argument.kind == Argument::kPlain ? ValueOfArgument(argument) : kUnknownValue;
        const auto known = types_.SizeOf(given.set) == 1 ? EntriesOf(types_.TypesOf(given.set)[0])
                                                         : std::vector<std::pair<Text, Value>>();
        is_whole = is_whole && !known.empty();
        for (const auto& [key, value] : known) add(key, value);
      }
      if (!is_whole || entries.empty()) return {};
      Value values;
      for (const auto& [key, value] : entries) values = types_.Union(values, WithoutLiterals(value));
      const TypeSetId args[] = {InstanceNamed("builtins", "str").set, values.Packed()};
      return answer(Just(types_.Add(TypeKind::kInstance, t.a, LiteralNumber(TextOfEntries(entries)), args)));
    }
    if (name == "tuple" && arguments.size() == 1) {
      const Value given = at(0);
      if (types_.SizeOf(given.set) == 1 && types_[types_.TypesOf(given.set)[0]].kind == TypeKind::kTuple)
        return answer(given);
      return answer(InstanceNamed("builtins", "tuple", {IterationOf(given).Packed()}));
    }
    return {};
  }
  if (t.kind != TypeKind::kFunction) return {};
  const FunctionInfo& info = functions_[t.a];
  const SourceFile* file = FileOf(info.file);
  if (file == nullptr || info.stmt == kModuleStmt || info.cls != kNoId) return {};
  const Text name = file->syntax.NameOf(file->syntax.stmt(info.stmt));
  if (name == "namedtuple" && has_call)
    return answer(Just(types_.Add(TypeKind::kClass, MadeClass(*caller, place.expr, "namedtuple"))));
  if (name == "wraps" && arguments.size() >= 1 && modules_.OfFile(info.file) == modules_.Find("functools"))
    return answer(Just(types_.Add(TypeKind::kSpecial, static_cast<uint32_t>(SpecialForm::kIdentity))));
  if (!file->is_stub) return {};
  if (name == "cast" && arguments.size() >= 2)
    return answer(ValueOfHint(arguments[0].place.file, arguments[0].place.expr, arguments[0].frame));
  if (name == "getattr" && arguments.size() >= 2) {
    Value value;
    for (const TypeId id : types_.CopyOf(at(1).set)) {
      const Text literal = LiteralOf(types_[id]);
      if (literal.size() > 2 && (literal.front() == '\'' || literal.front() == '"'))
        value = types_.Union(value, AttributeOf(at(0), Kept(literal.substr(1, literal.size() - 2))));
    }
    if (arguments.size() > 2) value = types_.Union(value, at(2));
    return value.IsKnown() ? answer(value) : Value{};
  }
  return {};
}

Value Inference::ResultOfType(TypeId callee, std::vector<Argument>& arguments, ExprPlace place) {
  const Type t = types_[callee];
  switch (t.kind) {
    case TypeKind::kClass:
      return ResultOfClassCall(callee, arguments, place);
    case TypeKind::kFunction: {
      bool is_special = false;
      const Value special = ResultOfSpecialCall(callee, arguments, place, is_special);
      return is_special ? special : ResultOfFunctionCall(callee, arguments);
    }
    case TypeKind::kCallable: {
      Solution solution;
      for (size_t i = 0; i + 1 < t.args_count && i < arguments.size(); ++i) {
        if (arguments[i].kind != Argument::kPlain) break;
        Solve(types_.ArgOf(callee, i + 1), ValueOfArgument(arguments[i]).set, solution);
      }
      const TypeSetId result = types_.ArgOf(callee, 0);
      return Substitute({result, static_cast<uint8_t>(WithoutOpen(result) == kNoTypes ? Value::kOpen : 0)}, solution,
                        true);
    }
    case TypeKind::kSpecial: {
      const auto form = static_cast<SpecialForm>(t.a);
      if (form == SpecialForm::kIdentity) return arguments.empty() ? kUnknownValue : ValueOfArgument(arguments[0]);
      const SourceFile* caller = place.file == kNoFile ? nullptr : FileOf(place.file);
      if (form == SpecialForm::kTypedDict && caller != nullptr && caller->syntax[place.expr].kind == ExprKind::kCall)
        return Just(types_.Add(TypeKind::kClass, MadeClass(*caller, place.expr, "TypedDict")));
      return kUnknownValue;
    }
    case TypeKind::kForeign:
      return Just(callee, Value::kOpen);
    case TypeKind::kTypeForm:
      return {types_.ArgOf(callee, 0), 0};
    case TypeKind::kInstance: {
      if (t.args_count == 1 && classes_[t.a].name == "type") return {types_.ArgOf(callee, 0), 0};
      if (t.args_count == 1 && t.a == ClassNamed("builtins", "staticmethod"))
        return ResultOf({types_.ArgOf(callee, 0), 0}, arguments, place);
      const auto member = FindMember(t.a, "__call__");
      if (!member) return kUnknownValue;
      return ResultOf(ValueOfMember(*member, "__call__", callee, false), arguments, place);
    }
    default:
      return kUnknownValue;
  }
}

Value Inference::ResultOf(Value callee, std::vector<Argument>& arguments, ExprPlace place) {
  static constexpr int kMoreDepth = 20;  // what goes deeper is cut where it is remembered
  if ((guess_level_ == kMaxGuesses ? steps_ : guess_steps_) == 0 || depth_ >= max_depth_ + kMoreDepth) {
    lowest_ = std::min(lowest_, surface_);
    return kUnknownValue;
  }
  ++depth_;
  Value value{kNoTypes, callee.doubt};
  // Of overloads the first that fits best is called.
  std::vector<TypeId> overloads, fitting;
  bool is_any = false;
  const TypeList callees = types_.CopyOf(callee.set);
  for (const TypeId id : callees)
    if (types_[id].kind == TypeKind::kFunction && (functions_[types_[id].a].flags & kIsOverload) != 0)
      overloads.push_back(id);
  if (overloads.size() > 1) {
    std::ranges::sort(overloads, [&](TypeId a, TypeId b) {
      const FunctionInfo &left = functions_[types_[a].a], &right = functions_[types_[b].a];
      return std::pair(left.file, left.stmt) < std::pair(right.file, right.stmt);
    });
    int best = -1;
    for (const TypeId id : overloads) {
      if (best == 2) break;
      Solution solution;
      const FunctionId function = types_[id].a;
      const bool is_bound = types_[id].args_count > 0;
      int score = MatchArguments(function, is_bound, arguments, solution, nullptr);
      if (score >= 0 && is_bound) {
        const auto parameters = ParametersOf(functions_[function]);
        const ExprId hint =
            parameters.empty() ? kNoExpr : HintOfParameter(*FileOf(functions_[function].file), functions_[function], 0);
        if (hint != kNoExpr)
          score = std::min(
              score,
              Assignable(ValueOfHint(functions_[function].file, hint).set, {types_.ArgOf(id, 0), 0}) == 0 ? 0 : 2);
      }
      if (score > best) {
        best = score;
        fitting.clear();
      }
      if (score == best) fitting.push_back(id);
    }
    if (fitting.empty()) fitting.push_back(overloads[0]);
    // None that fits is as good as another, but in stubs, whose first ones are the plain ones; and of those that may
    // fit it is the first, perhaps.
    static constexpr size_t kMostCompared = 3;
    if (best > 0 && fitting.size() > kMostCompared) fitting.resize(kMostCompared);
    if (best == 2 || best < 0) fitting.resize(1);
    is_any = best == 0 && !FileOf(functions_[types_[overloads[0]].a].file)->is_stub;
    if (best == 0 && !is_any) fitting.resize(1);
  }
  for (const TypeId id : callees) {
    const bool is_overload = overloads.size() > 1 && std::ranges::find(overloads, id) != overloads.end();
    if (is_overload || (types_[id].kind == TypeKind::kNone && callees.size() > 1)) continue;
    const Value one = ResultOfType(id, arguments, place);
    value.set = types_.Union(value.set, one.set);
    value.doubt |= one.doubt;
    if (IsInVain(value)) break;
  }
  const auto said_by = [&](TypeId id) {
    const FunctionInfo info = functions_[types_[id].a];
    const SourceFile* file = FileOf(info.file);
    return info.stmt == kModuleStmt ? kUnknownValue : ValueOfHint(info.file, file->syntax.stmt(info.stmt).hint);
  };
  for (size_t i = 0; i < fitting.size() && !IsInVain(value); ++i) {
    // Another that may be meant and says something else leaves a doubt.
    if (i > 0 && (is_any || said_by(fitting[i]) != said_by(fitting[0]))) value.doubt |= Value::kGuessed;
    if (i > 0 && !is_any) continue;
    const Value one = ResultOfType(fitting[i], arguments, place);
    value = {types_.Union(value.set, one.set), static_cast<uint8_t>(value.doubt | one.doubt)};
  }
  --depth_;
  return value;
}

}  // namespace quillet
