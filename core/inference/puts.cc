// What statements put into a container, beside what it is made with.
#include <algorithm>
#include <memory>

#include "inference/inference.h"

namespace quillet {

// What statements put into a container, and into the containers that it holds.
struct Inference::Puts {
  Value keys, items;
  bool is_known = false;
  std::unique_ptr<Puts> inner;
};

// Of what `use` stands for: a name, or what is taken out of it by a key.
void Inference::CollectPuts(const SourceFile& file, ExprId use, Puts& puts, int depth) {
  static constexpr int kMaxNesting = 2;
  const FileSyntax& syntax = file.syntax;
  const ExprId parent = syntax[use].parent;
  const auto inner = [&](ExprId taken) {
    if (depth == kMaxNesting) return;
    if (puts.inner == nullptr) puts.inner = std::make_unique<Puts>();
    CollectPuts(file, taken, *puts.inner, depth + 1);
    puts.is_known = puts.is_known || puts.inner->is_known;
  };
  const auto add_item = [&](Value item) {
    puts.items = types_.Union(puts.items, item);
    puts.is_known = true;
  };
  const auto add_entry = [&](Value key, Value item) {
    puts.keys = types_.Union(puts.keys, key);
    add_item(item);
  };
  // All that another container holds.
  const auto add_all = [&](ExprId from) {
    if (from == kNoExpr) return;
    const Value all = ValueOf(file.id, from);
    const ClassId mapping = ClassNamed("typing", "Mapping");
    for (const TypeId id : types_.CopyOf(all.set)) {
      if (types_[id].kind == TypeKind::kInstance && IsSubclass(types_[id].a, mapping)) {
        add_entry({ArgsAs(id, mapping, 0), 0}, {ArgsAs(id, mapping, 1), 0});
      } else {
        add_item(IterationOf(Just(id)));
      }
    }
  };
  const StmtId at = syntax.StatementAt(syntax[use].begin);
  const Stmt& stmt = syntax.stmt(at);
  const auto exprs = syntax.ExprsOf(stmt);
  if (parent == kNoExpr) {
    if (stmt.kind == StmtKind::kAugmentedAssign && exprs.size() == 2 && exprs[0] == use &&
        (stmt.op == CodeOfText("+=") || stmt.op == CodeOfText("|=")))
      add_all(exprs[1]);
    return;
  }
  if (syntax[parent].kind == ExprKind::kAttribute && syntax.ChildOf(parent, 0) == use) {
    const ExprId call = syntax[parent].parent;
    if (call == kNoExpr || syntax[call].kind != ExprKind::kCall || syntax.ChildOf(call, 0) != parent) return;
    const Text method = syntax.NameOf(parent);
    const ExprId first = syntax.ChildOf(call, 1), second = syntax.ChildOf(call, 2);
    if (first == kNoExpr) return;
    if (method == "append" || method == "add" || method == "appendleft") {
      add_item(ValueOf(file.id, first));
    } else if (method == "insert") {
      if (second != kNoExpr) add_item(ValueOf(file.id, second));
    } else if (method == "extend" || method == "extendleft") {
      add_item(IterationOf(ValueOf(file.id, first)));
    } else if (method == "update" || method == "__ior__") {
      for (const ExprId argument : syntax.ChildrenOf(call).subspan(1)) {
        if (syntax[argument].kind == ExprKind::kKeyword) {
          add_entry(InstanceNamed("builtins", "str"), ValueOf(file.id, syntax.ChildOf(argument, 0)));
        } else if (syntax[argument].kind != ExprKind::kStarred) {
          add_all(syntax[argument].kind == ExprKind::kDoubleStarred ? syntax.ChildOf(argument, 0) : argument);
        }
      }
    } else if (method == "setdefault") {
      add_entry(ValueOf(file.id, first), second == kNoExpr ? NoneValue() : ValueOf(file.id, second));
      inner(call);
    } else if (method == "__setitem__" && second != kNoExpr) {
      add_entry(ValueOf(file.id, first), ValueOf(file.id, second));
    }
    return;
  }
  if (syntax[parent].kind == ExprKind::kSubscript && syntax.ChildOf(parent, 0) == use) {
    const ExprId key = syntax.ChildOf(parent, 1);
    const bool is_own_target = (syntax[parent].flags & kIsTarget) != 0 && syntax[parent].parent == kNoExpr;
    if (is_own_target && stmt.kind == StmtKind::kAssign) {
      const Value given = ValueOf(file.id, exprs.back());
      if (key != kNoExpr && syntax[key].kind == ExprKind::kSlice) {
        add_item(IterationOf(given));
      } else {
        add_entry(ValueOf(file.id, key), given);
      }
    } else if (is_own_target && stmt.kind == StmtKind::kAugmentedAssign) {
      puts.keys = types_.Union(puts.keys, ValueOf(file.id, key));
      inner(parent);
    } else if ((syntax[parent].flags & kIsTarget) == 0) {
      inner(parent);
    }
    return;
  }
  // `heapq.heappush(heap, item)`
  if (syntax[parent].kind == ExprKind::kCall && syntax.ChildOf(parent, 1) == use) {
    const ExprId callee = syntax.ChildOf(parent, 0), second = syntax.ChildOf(parent, 2);
    const Text name = callee == kNoExpr                             ? kNoText
                      : syntax[callee].kind == ExprKind::kAttribute ? syntax.NameOf(callee)
                                                                    : syntax.TextOf(syntax[callee]);
    if (second != kNoExpr && (name == "heappush" || name == "heappushpop" || name.starts_with("insort")))
      add_item(ValueOf(file.id, second));
  }
}

// A container with what was put into it.
Value Inference::WithPuts(Value container, const Puts& puts) {
  if (!puts.is_known) return container;
  const ClassId mapping = ClassNamed("typing", "Mapping");
  Value result{kNoTypes, container.doubt};
  for (const TypeId id : types_.CopyOf(container.set)) {
    const Type t = types_[id];
    const bool is_container = t.kind == TypeKind::kInstance && (t.args_count == 1 || t.args_count == 2) &&
                              modules_[modules_.OfFile(classes_[t.a].file)].name != "types";
    if (!is_container) {
      result = types_.Union(result, Just(id));
      continue;
    }
    const bool is_mapping = IsSubclass(t.a, mapping);
    std::vector<TypeSetId> args(types_.ArgsOf(id).begin(), types_.ArgsOf(id).end());
    // Others may put something into it.
    if (is_mapping && args.size() == 2) args[0] = types_.Union(args[0], WithoutLiterals(puts.keys).Packed()) | kOpenSet;
    TypeSetId& items = args.back();
    if (!is_mapping || args.size() == 2) items = types_.Union(items, WithoutLiterals(puts.items).Packed()) | kOpenSet;
    if (puts.inner != nullptr) items = WithPuts({WithoutOpen(items), 0}, *puts.inner).set | (items & kOpenSet);
    result = types_.Union(result, Just(types_.Add(TypeKind::kInstance, t.a, 0, args)));
  }
  return result;
}

// A value that a name is given, where it is a container that statements behind may put something into: with what they
// put.
Value Inference::WithItemsPutInto(const SourceFile& file, ExprId target, Value held) {
  const FileSyntax& syntax = file.syntax;
  const ExprId value = syntax.ExprsOf(syntax.stmt(syntax.StatementOf(target))).back();
  const auto is_container = [&](auto&& self, ExprId expr) -> bool {
    switch (syntax[expr].kind) {
      case ExprKind::kList:
      case ExprKind::kDict:
      case ExprKind::kSet:
      case ExprKind::kListComprehension:
      case ExprKind::kDictComprehension:
      case ExprKind::kSetComprehension:
        return true;
      case ExprKind::kBinary:
        return self(self, syntax.ChildOf(expr, 0));
      case ExprKind::kCall: {
        const ExprId callee = syntax.ChildOf(expr, 0);
        const Text name =
            syntax[callee].kind == ExprKind::kAttribute ? syntax.NameOf(callee) : syntax.TextOf(syntax[callee]);
        static constexpr Text kContainers[] = {"list", "dict", "set", "deque", "defaultdict", "OrderedDict", "Counter"};
        return std::ranges::find(kContainers, name) != std::end(kContainers);
      }
      default:
        return false;
    }
  };
  if (!is_container(is_container, value)) return held;
  std::vector<uint32_t> uses;  // offsets of the name
  const uint32_t index =
      file.OccurrenceBeginningAt(syntax[target].name_end > 0 ? syntax[target].name_begin : syntax[target].begin);
  if (index == kNoIndex) return held;
  const Occurrence& occurrence = file.bindings.occurrences[index];
  const uint32_t variable = file.bindings.VariableOf(occurrence);
  static constexpr size_t kMaxUses = 200;
  if (variable != kNoIndex) {
    for (const uint32_t i : file.occurrences().Of(variable)) {
      if (uses.size() < kMaxUses) uses.push_back(file.bindings.occurrences[i].begin);
    }
  } else {
    // An attribute: the same name behind the same receiver's name, in the class around.
    StmtId around = syntax.StatementAt(occurrence.begin);
    while (around != kModuleStmt && syntax.stmt(around).kind != StmtKind::kClass) around = syntax.stmt(around).parent;
    if (around == kModuleStmt) return held;
    const uint32_t end = syntax.stmt(around).block_end;
    const auto& all = file.bindings.occurrences;
    const uint32_t own_receiver = file.bindings.ReceiverOf(index);
    if (own_receiver == kNoIndex) return held;
    auto at = std::ranges::lower_bound(all, syntax.stmt(around).begin, {}, &Occurrence::begin);
    for (; at != all.end() && at->begin < end && uses.size() < kMaxUses; ++at) {
      if (!at->is_attribute || at->text != occurrence.text) continue;
      const uint32_t receiver = file.bindings.ReceiverOf(static_cast<uint32_t>(at - all.begin()));
      if (receiver != kNoIndex && all[receiver].text == all[own_receiver].text) uses.push_back(at->begin);
    }
  }
  Puts puts;
  for (const uint32_t offset : uses) {
    const ExprId use = syntax.NamedAt(offset);
    if (use != kNoExpr && use != target) CollectPuts(file, use, puts, 0);
  }
  return puts.is_known ? WithPuts(WithoutDisplay(held), puts) : held;
}

}  // namespace quillet
