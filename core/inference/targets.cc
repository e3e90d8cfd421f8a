// What the targets of assignments, loops, `with`, `except` and patterns are given.
#include <algorithm>
#include <array>
#include <tuple>

#include "inference/inference.h"

namespace quillet {

Value Inference::Entered(Value manager, bool is_async) {
  Value value = CallMethod(manager, is_async ? "__aenter__" : "__enter__", {});
  return is_async ? EvaluateAwait(value) : value;
}

// A class, or tuples and lists of classes. What goes on for ever, as a text does, which holds texts, catches nothing.
Value Inference::Caught(Value type, int depth) {
  static constexpr int kMaxNesting = 8;
  Value value{kNoTypes, type.doubt};
  if (depth > kMaxNesting) return value;
  for (const TypeId id : types_.CopyOf(type.set)) {
    const Type t = types_[id];
    if (t.kind == TypeKind::kClass) value = types_.Union(value, Just(InstanceOf(t.a)));
    if (t.kind == TypeKind::kTuple) {
      for (size_t i = 0; i < t.args_count; ++i)
        value = types_.Union(value, Caught({types_.ArgOf(id, i), 0}, depth + 1));
    } else if (t.kind == TypeKind::kInstance) {
      const Value items = IterationOf(Just(id));
      if (items.IsKnown()) value = types_.Union(value, Caught(items, depth + 1));
    }
  }
  return value;
}

// The value that a target gets of the value that the whole of its nest of targets gets.
Value Inference::Unpack(const SourceFile& file, ExprId target, ExprId root, Value value, ExprPlace source,
                        FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  std::vector<ExprId> path;
  for (ExprId at = target; at != root; at = syntax[at].parent) path.push_back(at);
  ExprId container = root;
  for (size_t step = path.size(); step-- > 0;) {
    const ExprId child = path[step];
    if (syntax[container].kind == ExprKind::kStarred) {  // the list of the rest, which its container made
      container = child;
      continue;
    }
    const auto targets = syntax.ChildrenOf(container);
    const auto index = static_cast<size_t>(std::ranges::find(targets, child) - targets.begin());
    size_t star = SIZE_MAX;
    for (size_t i = 0; i < targets.size(); ++i)
      if (syntax[targets[i]].kind == ExprKind::kStarred) star = i;
    // A display of as many items gives each target its own.
    if (source.expr != kNoExpr &&
        (syntax[source.expr].kind == ExprKind::kTuple || syntax[source.expr].kind == ExprKind::kList)) {
      const auto items = syntax.ChildrenOf(source.expr);
      const bool has_star =
          std::ranges::any_of(items, [&](ExprId item) { return syntax[item].kind == ExprKind::kStarred; });
      if (star != SIZE_MAX && !has_star && items.size() + 1 >= targets.size() &&
          syntax[source.expr].kind == ExprKind::kList) {
        const size_t behind = targets.size() - star - 1;
        if (index != star) {
          source.expr = items[index < star ? index : items.size() + index - targets.size()];
          value = ValueOf(file.id, source.expr, frame);
        } else {
          Value rest;
          for (size_t i = star; i + behind < items.size(); ++i)
            rest = types_.Union(rest, ValueOf(file.id, items[i], frame));
          value = InstanceNamed("builtins", "list", {WithoutLiterals(rest).Packed()});
          source.expr = kNoExpr;
        }
        container = child;
        continue;
      }
      if (items.size() == targets.size() && !has_star && star == SIZE_MAX) {
        source.expr = items[index];
        value = ValueOf(file.id, source.expr, frame);
        container = child;
        continue;
      }
    }
    source.expr = kNoExpr;
    Value item{kNoTypes, value.doubt};
    for (const TypeId id : types_.CopyOf(value.set)) {
      const Type t = types_[id];
      if (t.kind == TypeKind::kTuple && index != star) {
        size_t at = index;
        if (star != SIZE_MAX && index > star)
          at = t.args_count + index >= targets.size() ? t.args_count + index - targets.size() : SIZE_MAX;
        if (at < t.args_count) item = types_.Union(item, Value{types_.ArgOf(id, at), 0});
      } else if (t.kind == TypeKind::kTuple) {
        Value rest;
        const size_t behind = targets.size() - star - 1;
        for (size_t i = star; i + behind < t.args_count; ++i) rest = types_.Union(rest, Value{types_.ArgOf(id, i), 0});
        item = types_.Union(item, InstanceNamed("builtins", "list", {rest.Packed()}));
      } else if (const auto row =
                     star == SIZE_MAX && LiteralOf(t).starts_with('^') ? ItemsInOrder(id, 0) : std::vector<Value>();
                 row.size() == targets.size()) {
        item = types_.Union(item, row[index]);
      } else if (t.kind == TypeKind::kInstance && star == SIZE_MAX && InfoOf(t.a).is_named_tuple &&
                 index < MembersOf(t.a).fields.size()) {
        item = types_.Union(item, AttributeOfType(id, MembersOf(t.a).fields[index].name));
      } else {
        const Value items = IterationOf(Just(id));
        item = types_.Union(item, index == star ? InstanceNamed("builtins", "list", {items.Packed()}) : items);
      }
    }
    value = item;
    container = child;
  }
  return value;
}

Value Inference::ValueOfTarget(const SourceFile& file, ExprId target, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  ExprId root = target;
  const auto is_container = [&](ExprId expr) {
    const ExprKind kind = syntax[expr].kind;
    return kind == ExprKind::kTuple || kind == ExprKind::kList || kind == ExprKind::kStarred;
  };
  while (syntax[root].parent != kNoExpr && is_container(syntax[root].parent)) root = syntax[root].parent;
  const ExprId parent = syntax[root].parent;
  if (syntax[root].kind == ExprKind::kPatternCapture || syntax[root].kind == ExprKind::kPatternStar)
    return ValueOfPattern(file, root, frame);
  if (parent != kNoExpr) {
    switch (syntax[parent].kind) {
      case ExprKind::kWithItem: {
        const StmtId stmt = syntax.StatementOf(parent);
        const bool is_async = (syntax.stmt(stmt).flags & kAsyncStmt) != 0;
        if (syntax.stmt(stmt).hint != kNoExpr) {
          const Value hint = ValueOfHint(file.id, syntax.stmt(stmt).hint, frame);
          if (hint.IsKnown()) return Unpack(file, target, root, hint, {}, frame);
        }
        const Value entered = Entered(ValueOf(file.id, syntax.ChildOf(parent, 0), frame), is_async);
        return Unpack(file, target, root, entered, {}, frame);
      }
      case ExprKind::kComprehensionFor: {
        const bool is_async = (syntax[parent].flags & kAsyncClause) != 0;
        const ExprId iterable = syntax.ChildOf(parent, 1);
        return Unpack(file, target, root, IterationOf(ValueOf(file.id, iterable, frame), is_async), {}, frame);
      }
      case ExprKind::kNamed:
        return ValueOf(file.id, syntax.ChildOf(parent, 1), frame);
      case ExprKind::kPatternAs:
        return ValueOfPattern(file, syntax.ChildOf(parent, 0), frame);
      default:
        return kUnknownValue;
    }
  }
  const StmtId id = syntax.StatementOf(root);
  const Stmt& stmt = syntax.stmt(id);
  const auto exprs = syntax.ExprsOf(stmt);
  if (stmt.kind == StmtKind::kAssign || stmt.kind == StmtKind::kAnnotated) {
    const Value form = file.is_stub ? FormOf(file, target) : kUnknownValue;
    if (form.IsKnown()) return form;
  }
  switch (stmt.kind) {
    case StmtKind::kAssign: {
      if (stmt.hint != kNoExpr) {
        const Value hint = ValueOfHint(file.id, stmt.hint, frame);
        if (hint.IsKnown()) return Unpack(file, target, root, hint, {}, frame);
      }
      const ExprId value = exprs.back();
      if (root == target) return WithItemsPutInto(file, target, ValueOf(file.id, value, frame));
      return Unpack(file, target, root, ValueOf(file.id, value, frame), {file.id, value}, frame);
    }
    case StmtKind::kAnnotated: {
      const Text hinted = syntax.NameOf(stmt.hint);
      if (hinted == "TypeAlias" && exprs.size() > 1) {
        const Value alias = ValueOfHint(file.id, exprs[1], frame);
        return alias.IsKnown() ? Just(types_.Add(TypeKind::kTypeForm, 0, 0, {alias.set}), alias.doubt) : kUnknownValue;
      }
      const Value hint = ValueOfHint(file.id, stmt.hint, frame);
      if (hint.IsKnown() || exprs.size() < 2) return hint;
      return ValueOf(file.id, exprs[1], frame);
    }
    case StmtKind::kAugmentedAssign: {
      if (exprs.size() < 2) return kUnknownValue;
      const Value before = ValueOf(file.id, exprs[0], frame);
      static constexpr std::array<std::tuple<Text, Text, Text>, 13> kOperators{
          {{"+=", "__add__", "__radd__"},
           {"-=", "__sub__", "__rsub__"},
           {"*=", "__mul__", "__rmul__"},
           {"/=", "__truediv__", "__rtruediv__"},
           {"//=", "__floordiv__", "__rfloordiv__"},
           {"%=", "__mod__", "__rmod__"},
           {"**=", "__pow__", "__rpow__"},
           {"|=", "__or__", "__ror__"},
           {"&=", "__and__", "__rand__"},
           {"^=", "__xor__", "__rxor__"},
           {"<<=", "__lshift__", "__rlshift__"},
           {">>=", "__rshift__", "__rrshift__"},
           {"@=", "__matmul__", "__rmatmul__"}}};
      for (const auto& [text, method, reflected] : kOperators) {
        if (CodeOfText(text) != stmt.op) continue;
        const std::string in_place = "__i" + std::string(method.substr(2));
        bool has_method = false;
        const Value result = CallMethod(before, in_place, {ValueOf(file.id, exprs[1], frame)}, &has_method);
        if (has_method && result.IsKnown()) return result;
        const Value operated = Operate(before, ValueOf(file.id, exprs[1], frame), method, reflected);
        return operated.IsKnown() ? operated : Value{before.set, static_cast<uint8_t>(before.doubt | Value::kOpen)};
      }
      return before;
    }
    case StmtKind::kFor: {
      if (exprs.size() < 2) return kUnknownValue;
      if (stmt.hint != kNoExpr) {
        const Value hint = ValueOfHint(file.id, stmt.hint, frame);
        if (hint.IsKnown()) return Unpack(file, target, root, hint, {}, frame);
      }
      const Value iterable = ValueOf(file.id, exprs[1], frame);
      return Unpack(file, target, root, IterationOf(iterable, (stmt.flags & kAsyncStmt) != 0), {}, frame);
    }
    case StmtKind::kExcept: {
      const Value caught = exprs.empty() ? kUnknownValue : Caught(ValueOf(file.id, exprs[0], frame));
      if ((stmt.flags & kExceptGroup) == 0) return caught;
      Value group = InstanceNamed("builtins", "ExceptionGroup", {caught.Packed()});
      group.doubt |= caught.doubt;
      return group;
    }
    default:
      return kUnknownValue;
  }
}

// What a pattern, or the name that it is, stands for: what it says itself, or else what it is compared with.
Value Inference::ValueOfPattern(const SourceFile& file, ExprId pattern, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  if (syntax[pattern].kind == ExprKind::kPatternClass) {
    const Value cls = ValueOf(file.id, syntax.ChildOf(pattern, 0), frame);
    if (cls.IsKnown()) return Caught(cls);
  }
  if (syntax[pattern].kind == ExprKind::kPatternOr) {
    Value value;
    for (const ExprId alternative : syntax.ChildrenOf(pattern))
      value = types_.Union(value, ValueOfPattern(file, alternative, frame));
    return value;
  }
  if (syntax[pattern].kind == ExprKind::kPatternAs) return ValueOfPattern(file, syntax.ChildOf(pattern, 0), frame);
  if (syntax[pattern].kind == ExprKind::kPatternValue) return ValueOf(file.id, syntax.ChildOf(pattern, 0), frame);
  return ValueMatchedBy(file, pattern, frame);
}

// What a pattern is compared with: the part that falls to it of what is matched.
Value Inference::ValueMatchedBy(const SourceFile& file, ExprId pattern, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const ExprId parent = syntax[pattern].parent;
  if (parent == kNoExpr) {
    const StmtId match = syntax.stmt(syntax.StatementOf(pattern)).parent;
    const auto subject = syntax.ExprsOf(syntax.stmt(match));
    return subject.empty() ? kUnknownValue : ValueOf(file.id, subject[0], frame);
  }
  const auto children = syntax.ChildrenOf(parent);
  const auto index = static_cast<size_t>(std::ranges::find(children, pattern) - children.begin());
  switch (syntax[parent].kind) {
    case ExprKind::kPatternAs:
    case ExprKind::kPatternOr:
      return ValueMatchedBy(file, parent, frame);
    case ExprKind::kPatternSequence: {
      const Value whole = ValueOfPattern(file, parent, frame);
      Value item{kNoTypes, whole.doubt};
      const bool has_star = std::ranges::any_of(
          children.first(index), [&](ExprId child) { return syntax[child].kind == ExprKind::kPatternStar; });
      for (const TypeId id : types_.CopyOf(whole.set)) {
        if (types_[id].kind == TypeKind::kTuple && !has_star && index < types_[id].args_count) {
          item = types_.Union(item, Value{types_.ArgOf(id, index), 0});
        } else {
          item = types_.Union(item, IterationOf(Just(id)));
        }
      }
      return syntax[pattern].kind == ExprKind::kPatternStar ? InstanceNamed("builtins", "list", {item.Packed()}) : item;
    }
    case ExprKind::kPatternMapping: {
      const Value whole = ValueOfPattern(file, parent, frame);
      if (syntax[pattern].kind == ExprKind::kPatternStar) return whole;
      const ExprId key = index > 0 ? children[index - 1] : kNoExpr;
      const ExprId value = key == kNoExpr                                ? kNoExpr
                           : syntax[key].kind == ExprKind::kPatternValue ? syntax.ChildOf(key, 0)
                                                                         : key;
      return ItemOf(whole, file, std::span(&value, 1), frame);
    }
    case ExprKind::kKeyword: {
      const ExprId cls = syntax[parent].parent;
      return cls == kNoExpr ? kUnknownValue : AttributeOf(ValueOfPattern(file, cls, frame), syntax.NameOf(parent));
    }
    case ExprKind::kPatternClass: {
      const Value whole = ValueOfPattern(file, parent, frame);
      Value value{kNoTypes, whole.doubt};
      for (const TypeId id : types_.CopyOf(whole.set)) {
        if (types_[id].kind != TypeKind::kInstance) continue;
        ClassInfo& info = MembersOf(types_[id].a);
        if (index >= 1 && index - 1 < info.fields.size()) {
          value = types_.Union(value, AttributeOf(Just(id), info.fields[index - 1].name));
          continue;
        }
        const Value names = AttributeOf(Just(types_.Add(TypeKind::kClass, types_[id].a)), "__match_args__");
        bool has_name = false;
        for (const TypeId tuple : types_.CopyOf(names.set)) {
          if (types_[tuple].kind != TypeKind::kTuple || index < 1) continue;
          for (const TypeId name : types_.CopyOf(types_.ArgOf(tuple, index - 1))) {
            const Text text = LiteralOf(types_[name]);
            if (text.size() < 2) continue;
            has_name = true;
            value = types_.Union(value, AttributeOf(Just(id), text.substr(1, text.size() - 2)));
          }
        }
        if (!has_name) value = types_.Union(value, index == 1 ? Just(id, Value::kOpen) : kUnknownValue);
      }
      return value;
    }
    default:
      return kUnknownValue;
  }
}

}  // namespace quillet
