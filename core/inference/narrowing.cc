// What conditions say: which value a name has where they hold, and which of them hold in every run.
#include <algorithm>

#include "inference/flow.h"
#include "inference/inference.h"

namespace quillet {

namespace {

// Longer chains of attributes and items are not followed.
constexpr int kMaxLinks = 64;
// How much is looked at for one name: uses of it, conditions around it.
constexpr size_t kMaxLooks = size_t{1} << 12;

// The key of an item whose key is a literal; empty for others.
Text KeyOf(const FileSyntax& syntax, ExprId expr) {
  if (syntax[expr].kind != ExprKind::kSubscript || syntax[expr].children_count != 2) return {};
  const ExprId key = syntax.ChildOf(expr, 1);
  const bool is_literal =
      key != kNoExpr && (syntax[key].kind == ExprKind::kNumber || syntax[key].kind == ExprKind::kString);
  return is_literal ? syntax.TextOf(syntax[key]) : Text();
}

bool IsLink(const FileSyntax& syntax, ExprId expr) {
  return syntax[expr].kind == ExprKind::kAttribute || !KeyOf(syntax, expr).empty();
}

// Names, and attributes and items by literal keys of such, whose value stays what a condition found until something is
// assigned.
bool IsChain(const FileSyntax& syntax, ExprId expr) {
  for (int links = 0; IsLink(syntax, expr); ++links) {
    if (links == kMaxLinks) return false;
    expr = syntax.ChildOf(expr, 0);
  }
  return syntax[expr].kind == ExprKind::kName;
}

bool SameChain(const FileSyntax& syntax, ExprId a, ExprId b) {
  while (syntax[a].kind == syntax[b].kind && IsLink(syntax, a)) {
    if (syntax.NameOf(a) != syntax.NameOf(b) || KeyOf(syntax, a) != KeyOf(syntax, b)) return false;
    a = syntax.ChildOf(a, 0);
    b = syntax.ChildOf(b, 0);
  }
  return syntax[a].kind == ExprKind::kName && syntax[b].kind == ExprKind::kName &&
         syntax.TextOf(syntax[a]) == syntax.TextOf(syntax[b]);
}

// `not`, `and`, `or`.
bool IsMadeOfConditions(const Expr& e) {
  return e.kind == ExprKind::kBoolean || (e.kind == ExprKind::kUnary && e.op == word::kNot);
}

}  // namespace

class Inference::Narrowing {
 public:
  Narrowing(Inference& inference, const SourceFile& file, ExprId subject, FrameId frame)
      : in_(inference), file_(file), syntax_(file.syntax), subject_(subject), frame_(frame) {}

  // The value where the condition holds, or where it does not.
  Value Where(ExprId condition, bool holds, Value value, int depth = 0) {
    const Values found = WhereEither(condition, value, holds, !holds, depth);
    return holds ? found.holding : found.other;
  }

 private:
  struct Values {
    Value holding, other;  // where a condition holds, and where it does not
  };

  // Both at once, those that are wanted: an `or` is made of both of what stands in front of it.
  Values WhereEither(ExprId condition, Value value, bool wants_holding, bool wants_other, int depth) {
    static constexpr int kMaxNesting = 16;
    if (condition == kNoExpr || depth > kMaxNesting) return {value, value};
    const Expr& e = syntax_[condition];
    const ExprId left = syntax_.ChildOf(condition, 0), right = syntax_.ChildOf(condition, 1);
    if (e.kind == ExprKind::kUnary && e.op == word::kNot) {
      const Values found = WhereEither(left, value, wants_other, wants_holding, depth + 1);
      return {found.other, found.holding};
    }
    if (e.kind == ExprKind::kBoolean && e.op == word::kAnd) {
      const Values first = WhereEither(left, value, true, wants_other, depth + 1);
      const Values second = WhereEither(right, first.holding, wants_holding, wants_other, depth + 1);
      return {second.holding, wants_other ? in_.types_.Union(first.other, second.other) : value};
    }
    if (e.kind == ExprKind::kBoolean) {
      const Values first = WhereEither(left, value, wants_holding, true, depth + 1);
      const Values second = WhereEither(right, first.other, wants_holding, wants_other, depth + 1);
      return {wants_holding ? in_.types_.Union(first.holding, second.holding) : value, second.other};
    }
    return {wants_holding ? WhereAlone(condition, true, value, depth) : value,
            wants_other ? WhereAlone(condition, false, value, depth) : value};
  }

  // Of a condition that is not made of others.
  Value WhereAlone(ExprId condition, bool holds, Value value, int depth) {
    const Expr& e = syntax_[condition];
    switch (e.kind) {
      case ExprKind::kNamed:
        if (SameChain(syntax_, syntax_.ChildOf(condition, 0), subject_)) return Truth(value, holds);
        return value;
      case ExprKind::kName:
      case ExprKind::kAttribute:
      case ExprKind::kSubscript:
        return IsSubject(condition) ? Truth(value, holds) : value;
      case ExprKind::kCompare:
        return e.children_count == 2 ? Comparison(condition, holds, value) : value;
      case ExprKind::kCall:
        return Call(condition, holds, value);
      // What a `case` is met by.
      case ExprKind::kPatternClass:
        return holds ? OfClass(in_.ValueOf(file_.id, syntax_.ChildOf(condition, 0), frame_), value, true) : value;
      case ExprKind::kPatternAs:
        return Where(syntax_.ChildOf(condition, 0), holds, value, depth + 1);
      case ExprKind::kPatternOr: {
        if (!holds) return value;
        Value either;
        for (const ExprId pattern : syntax_.ChildrenOf(condition))
          either = in_.types_.Union(either, Where(pattern, true, value, depth + 1));
        return either;
      }
      default:
        return value;
    }
  }

  bool IsSubject(ExprId expr) const { return SameChain(syntax_, expr, subject_); }

  Value Truth(Value value, bool holds) { return in_.WithoutFalse(value, !holds); }

  Value Comparison(ExprId condition, bool holds, Value value) {
    const Expr& e = syntax_[condition];
    ExprId left = syntax_.ChildOf(condition, 0), right = syntax_.ChildOf(condition, 1);
    const auto op = static_cast<CompareOperator>(e.op);
    if (syntax_[left].kind == ExprKind::kNamed) left = syntax_.ChildOf(left, 0);
    const bool is_same = op == CompareOperator::kIs || op == CompareOperator::kEqual;
    const bool is_other = op == CompareOperator::kIsNot || op == CompareOperator::kNotEqual;
    if (!is_same && !is_other) return value;
    const bool says_same = is_same == holds;
    // `type(x) is C`
    if (syntax_[left].kind == ExprKind::kCall && says_same && syntax_.ChildrenOf(left).size() == 2 &&
        syntax_.TextOf(syntax_[syntax_.ChildOf(left, 0)]) == "type" && IsSubject(syntax_.ChildOf(left, 1)))
      return OfClass(in_.ValueOf(file_.id, right, frame_), value, true);
    if (!IsSubject(left)) {
      if (!IsSubject(right)) return value;
      std::swap(left, right);
    }
    const Expr& other = syntax_[right];
    if (other.kind == ExprKind::kConstant && other.op == static_cast<uint8_t>(ConstantValue::kNone)) {
      if (!says_same) return in_.WithoutNone(value);
      const auto types = in_.types_.CopyOf(value.set);
      const bool may_be = std::ranges::any_of(types, [&](TypeId id) { return in_.types_[id].kind == TypeKind::kNone; });
      return may_be || (value.doubt & Value::kOpen) != 0 ? in_.NoneValue() : value;
    }
    // A member of an enumeration or a literal.
    const Value compared = in_.ValueOf(file_.id, right, frame_);
    if (in_.types_.SizeOf(compared.set) != 1) return value;
    const TypeId literal = in_.types_.TypesOf(compared.set)[0];
    if (in_.types_[literal].b == 0 || in_.types_[literal].kind != TypeKind::kInstance) return value;
    std::vector<TypeId> rest;
    for (const TypeId id : in_.types_.CopyOf(value.set)) {
      const bool is_literal = id == literal;
      const bool is_plain = in_.types_[id].kind == TypeKind::kInstance && in_.types_[id].a == in_.types_[literal].a &&
                            in_.types_[id].b == 0;
      if (says_same ? is_literal || is_plain : !is_literal) rest.push_back(id);
    }
    return rest.empty() ? value : Value{in_.types_.SetOf(rest), value.doubt};
  }

  Value Call(ExprId condition, bool holds, Value value) {
    const auto children = syntax_.ChildrenOf(condition);
    const Text name = syntax_.TextOf(syntax_[children[0]]);
    if (children.size() == 3 && (name == "isinstance" || name == "issubclass")) {
      ExprId subject = children[1];
      if (syntax_[subject].kind == ExprKind::kNamed) subject = syntax_.ChildOf(subject, 0);
      if (!IsSubject(subject)) return value;
      const Value cls = in_.ValueOf(file_.id, children[2], frame_);
      return name == "isinstance" ? OfClass(cls, value, holds) : value;
    }
    if (children.size() == 2 && IsSubject(children[1])) {
      // A function that says of what it is given what it is.
      for (const TypeId id : in_.types_.CopyOf(in_.ValueOf(file_.id, children[0], frame_).set)) {
        if (in_.types_[id].kind != TypeKind::kFunction) continue;
        const FunctionInfo info = in_.functions_[in_.types_[id].a];
        const SourceFile* source = in_.FileOf(info.file);
        if (source == nullptr || info.lambda != kNoExpr) continue;
        const ExprId hint = source->syntax.stmt(info.stmt).hint;
        if (hint == kNoExpr || source->syntax[hint].kind != ExprKind::kSubscript) continue;
        const Text form = source->syntax.TextOf(source->syntax[source->syntax.ChildOf(hint, 0)]);
        if (!holds || !(form.ends_with("TypeGuard") || form.ends_with("TypeIs"))) continue;
        const Value said = in_.ValueOfHint(info.file, source->syntax.ChildOf(hint, 1));
        if (said.IsKnown()) return said;
      }
    }
    if (children.size() == 2 && name == "callable" && IsSubject(children[1])) {
      std::vector<TypeId> rest;
      for (const TypeId id : in_.types_.CopyOf(value.set)) {
        const Type t = in_.types_[id];
        const bool can = t.kind == TypeKind::kFunction || t.kind == TypeKind::kClass || t.kind == TypeKind::kCallable ||
                         (t.kind == TypeKind::kInstance && in_.FindMember(t.a, "__call__"));
        if (can == holds) rest.push_back(id);
      }
      return rest.empty() ? value : Value{in_.types_.SetOf(rest), value.doubt};
    }
    return value;
  }

  void Classes(Value cls, std::vector<TypeId>& found, int depth = 0) {
    if (depth > 4) return;
    for (const TypeId id : in_.types_.CopyOf(cls.set)) {
      const Type t = in_.types_[id];
      if (t.kind == TypeKind::kClass) found.push_back(id);
      if (t.kind == TypeKind::kTypeForm) {
        for (const TypeId inner : in_.types_.CopyOf(in_.types_.ArgOf(id, 0))) {
          if (in_.types_[inner].kind == TypeKind::kInstance)
            found.push_back(in_.types_.Add(TypeKind::kClass, in_.types_[inner].a));
        }
      }
      if (t.kind == TypeKind::kTuple)
        for (size_t i = 0; i < t.args_count; ++i) Classes({in_.types_.ArgOf(id, i), 0}, found, depth + 1);
    }
  }

  Value OfClass(Value cls, Value value, bool holds) {
    std::vector<TypeId> classes;
    Classes(cls, classes);
    if (classes.empty()) return value;
    std::vector<TypeId> kept;
    const TypeList types = in_.types_.CopyOf(value.set);
    for (const TypeId id : types) {
      const ClassId own = in_.ClassOfType(id);
      bool is_one = false;
      for (const TypeId candidate : classes)
        is_one = is_one || (own != kNoId && in_.IsSubclass(own, in_.types_[candidate].a));
      if (is_one == holds) kept.push_back(id);
    }
    if (!holds)
      return kept.empty() && !types.empty() && (value.doubt & Value::kOpen) == 0
                 ? value
                 : Value{in_.types_.SetOf(kept), value.doubt};
    // Those that are no instance of it may be one of a class that is both; and what is not known is one.
    bool adds_all = kept.empty();
    if (adds_all || (value.doubt & Value::kOpen) != 0) {
      for (const TypeId candidate : classes) {
        const ClassId wanted = in_.types_[candidate].a;
        bool is_narrower = false;  // something more exact is known
        for (const TypeId id : kept) {
          const ClassId own = in_.ClassOfType(id);
          is_narrower = is_narrower || (own != kNoId && in_.IsSubclass(own, wanted));
        }
        if (!is_narrower) kept.push_back(in_.InstanceOf(wanted));
      }
    }
    return {in_.types_.SetOf(kept), static_cast<uint8_t>(value.doubt & ~(Value::kOpen | Value::kGuessed))};
  }

  Inference& in_;
  const SourceFile& file_;
  const FileSyntax& syntax_;
  ExprId subject_;
  FrameId frame_;
};

const std::vector<ExprId>& Inference::WritesOf(const SourceFile& file, Text name) {
  const auto [at, is_new] = writes_.try_emplace(file.id);
  if (is_new) {
    const FileSyntax& syntax = file.syntax;
    for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
      if ((syntax[expr].flags & kIsTarget) == 0 || !IsLink(syntax, expr)) continue;
      const bool is_attribute = syntax[expr].kind == ExprKind::kAttribute;
      at->second[Kept(is_attribute ? syntax.NameOf(expr) : KeyOf(syntax, expr))].push_back(expr);
    }
  }
  static const std::vector<ExprId> kNone;
  const auto found = at->second.find(name);
  return found == at->second.end() ? kNone : found->second;
}

// Whether what an attribute is given is not what it gives: of properties and the like.
bool Inference::IsDescribed(Value receiver, Text name) {
  uint8_t doubt = 0;
  for (const Member& member : MembersOf(receiver, name, doubt)) {
    if (member.symbol == kNoIndex) continue;
    for (const TypeId id : types_.CopyOf(RawValueOfMember(member, name).set)) {
      const Type t = types_[id];
      if (t.kind == TypeKind::kFunction) return true;
      if (t.kind == TypeKind::kInstance &&
          (FindMember(t.a, "__get__") || IsSubclass(t.a, ClassNamed("builtins", "property"))))
        return true;
    }
  }
  return false;
}

Value Inference::Assigned(const SourceFile& file, ExprId expr, Value value, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const bool is_attribute = syntax[expr].kind == ExprKind::kAttribute;
  const std::vector<ExprId>& writes = WritesOf(file, is_attribute ? syntax.NameOf(expr) : KeyOf(syntax, expr));
  if (writes.empty()) return value;
  const auto root_of = [&](ExprId at) {  // of what is the same chain: a short one
    while (IsLink(syntax, at)) at = syntax.ChildOf(at, 0);
    return at;
  };
  const uint32_t scope = file.ScopeAt(syntax[expr].begin);
  const StmtId top = file.StmtOfScope(scope);
  const uint32_t root = syntax[root_of(expr)].begin;
  // Those of the same chain in the same scope; the offset of an assignment is that of its root.
  std::vector<std::pair<uint32_t, ExprId>> same;
  CountLooks(writes.size());
  if (writes.size() > kMaxLooks) return value;
  for (const ExprId write : writes)
    if (SameChain(syntax, write, expr) && file.ScopeAt(syntax[write].begin) == scope)
      same.emplace_back(syntax[root_of(write)].begin, write);
  if (same.empty()) return value;
  const uint32_t index = file.OccurrenceBeginningAt(root);
  const uint32_t variable = index == kNoIndex ? kNoIndex : file.bindings.VariableOf(file.bindings.occurrences[index]);
  if (variable == kNoIndex) return value;
  std::vector<uint32_t> offsets;
  for (const auto& [offset, write] : same) offsets.push_back(offset);
  // What is assigned to the parts in front of it.
  const auto uses = file.occurrences().Of(variable);
  CountLooks(uses.size());
  if (uses.size() > kMaxLooks) return value;
  for (const uint32_t i : uses) {
    const Occurrence& other = file.bindings.occurrences[i];
    if (other.binds()) {
      if (other.kind != NameKind::kParameter) offsets.push_back(other.begin);
      continue;
    }
    ExprId at = syntax.NamedAt(other.begin);
    for (int links = 0; links < kMaxLinks && at != kNoExpr && syntax[at].parent != kNoExpr &&
                        IsLink(syntax, syntax[at].parent) && syntax.ChildOf(syntax[at].parent, 0) == at;
         ++links) {
      at = syntax[at].parent;
      if ((syntax[at].flags & kIsTarget) == 0 || SameChain(syntax, at, expr)) continue;
      for (ExprId part = syntax.ChildOf(expr, 0); IsLink(syntax, part); part = syntax.ChildOf(part, 0))
        if (SameChain(syntax, at, part)) offsets.push_back(other.begin);
    }
  }
  std::ranges::sort(offsets);
  offsets.erase(std::unique(offsets.begin(), offsets.end()), offsets.end());
  const std::function<int(ExprId)> truth = [&](ExprId condition) { return StaticTruth(file, condition); };
  std::vector<uint32_t> reached;
  Flow flow(file, offsets, truth);
  const bool is_bound = flow.Reach(syntax[expr].begin, top, reached);
  CountLooks(flow.looks());
  if (!is_bound || reached.empty()) return value;
  Value given;
  for (const uint32_t offset : reached) {
    const auto write = std::ranges::find(same, offset, &std::pair<uint32_t, ExprId>::first);
    if (write == same.end()) return value;
    given = types_.Union(given, is_attribute ? ValueOfBinding({file.id, syntax[write->second].name_begin}, frame)
                                             : ValueOfTarget(file, write->second, frame));
  }
  // Nothing but None is what others fill in.
  const bool is_none = given == NoneValue();
  if (!given.IsKnown() || is_none || (given.doubt != 0 && value.IsKnown())) return value;
  if (is_attribute && IsDescribed(ValueOf(file.id, syntax.ChildOf(expr, 0), frame), syntax.NameOf(expr))) return value;
  return given;
}

// Conditions are applied from the outermost to the innermost.
Value Inference::Narrowed(const SourceFile& file, ExprId expr, Value value, FrameId frame) {
  if (!IsChain(file.syntax, expr) || (file.syntax[expr].flags & kIsTarget) != 0) return value;
  if (file.syntax[expr].kind != ExprKind::kName) value = Assigned(file, expr, value, frame);
  const std::vector<Condition> conditions = ConditionsOf(file, expr);
  Narrowing narrowing(*this, file, expr, frame);
  for (size_t i = conditions.size(); i-- > 0;) value = narrowing.Where(conditions[i].expr, conditions[i].holds, value);
  return value;
}

// Many of them are not remembered: each of their names has many.
std::vector<Inference::Condition> Inference::ConditionsOf(const SourceFile& file, ExprId expr) {
  static constexpr size_t kMaxRemembered = 32;
  std::vector<Condition> many;
  const auto find = [&] {
    std::vector<Condition> found = ConditionsOn(file, expr);
    if (found.size() <= kMaxRemembered) return found;
    many = std::move(found);
    return std::vector<Condition>{{kNoExpr, false}};
  };
  const std::vector<Condition>& found = conditions_.Get(file.id, expr, find);
  if (found.empty() || found[0].expr != kNoExpr) return found;
  return many.empty() ? ConditionsOn(file, expr) : many;
}

// The innermost first, and those only behind which nothing was assigned.
std::vector<Inference::Condition> Inference::ConditionsOn(const SourceFile& file, ExprId expr) {
  const FileSyntax& syntax = file.syntax;
  std::vector<Condition> conditions;
  ExprId root = expr;
  while (IsLink(syntax, root)) root = syntax.ChildOf(root, 0);
  const Text name = syntax.TextOf(syntax[root]);
  static constexpr size_t kMaxConditions = 512;
  static constexpr size_t kMaxClauses = 64;  // of a comprehension
  static constexpr uint32_t kBytesOfALook = 16;
  size_t looks = 0;
  const auto may_look = [&] { return ++looks <= kMaxLooks && conditions.size() < kMaxConditions; };
  const auto mentions = [&](uint32_t begin, uint32_t end) {
    looks += (end - begin) / kBytesOfALook;
    return looks <= kMaxLooks && Text(syntax.source + begin, end - begin).find(name) != Text::npos;
  };
  const auto add = [&](ExprId condition, bool holds) {
    if (condition != kNoExpr && mentions(syntax[condition].begin, syntax[condition].end))
      conditions.push_back({condition, holds});
  };
  // In the expression itself.
  for (ExprId at = expr; syntax[at].parent != kNoExpr && may_look(); at = syntax[at].parent) {
    const ExprId parent = syntax[at].parent;
    if (syntax[parent].kind == ExprKind::kBoolean && syntax.ChildOf(parent, 1) == at) {
      add(syntax.ChildOf(parent, 0), syntax[parent].op == word::kAnd);
    } else if (syntax[parent].kind == ExprKind::kConditional) {
      if (syntax.ChildOf(parent, 0) == at) add(syntax.ChildOf(parent, 1), true);
      if (syntax.ChildOf(parent, 2) == at) add(syntax.ChildOf(parent, 1), false);
    } else if (syntax[parent].kind == ExprKind::kListComprehension ||
               syntax[parent].kind == ExprKind::kSetComprehension || syntax[parent].kind == ExprKind::kGenerator ||
               syntax[parent].kind == ExprKind::kDictComprehension) {
      const auto clauses = syntax.ChildrenOf(parent);
      for (const ExprId clause : clauses.first(std::min(clauses.size(), kMaxClauses))) {
        if (clause == at || !may_look() || syntax[clause].kind != ExprKind::kComprehensionFor) continue;
        const auto parts = syntax.ChildrenOf(clause);
        for (size_t i = 2; i < parts.size() && may_look(); ++i) add(parts[i], true);
      }
    }
  }
  // In the statements around and in front, as far as the scope reaches.
  StmtId stmt = syntax.StatementAt(syntax[expr].begin);
  static constexpr int kMaxStatements = 400;
  int budget = kMaxStatements;
  const auto condition_of = [&](StmtId clause) {
    const auto exprs = syntax.ExprsOf(syntax.stmt(clause));
    return exprs.empty() ? kNoExpr : exprs[0];
  };
  const auto in_head = [&](StmtId clause) { return syntax[expr].begin < syntax.stmt(clause).end; };
  for (; stmt != kModuleStmt && may_look(); stmt = syntax.stmt(stmt).parent) {
    const Stmt& own = syntax.stmt(stmt);
    if (own.kind == StmtKind::kDef || own.kind == StmtKind::kClass) {
      if (!in_head(stmt)) break;
    }
    const bool in_own_head = in_head(stmt);
    if (!in_own_head && (own.kind == StmtKind::kIf || own.kind == StmtKind::kElif || own.kind == StmtKind::kWhile))
      add(condition_of(stmt), true);
    if (!in_own_head && own.kind == StmtKind::kCase) {
      const ExprId subject = condition_of(own.parent);
      if (subject != kNoExpr && SameChain(syntax, subject, expr)) conditions.push_back({condition_of(stmt), true});
    }
    StmtId at = stmt;
    if (own.kind == StmtKind::kElif || own.kind == StmtKind::kElse) {
      for (;;) {
        at = syntax.stmt(at).previous;
        if (at == kModuleStmt || !may_look()) break;
        const StmtKind kind = syntax.stmt(at).kind;
        if (kind == StmtKind::kIf || kind == StmtKind::kElif) add(condition_of(at), false);
        if (kind != StmtKind::kElif && kind != StmtKind::kElse) break;
      }
    }
    for (at = at == kModuleStmt ? kModuleStmt : syntax.stmt(at).previous; at != kModuleStmt && --budget > 0;
         at = syntax.stmt(at).previous) {
      const Stmt& before = syntax.stmt(at);
      if (before.kind == StmtKind::kAssert) {
        add(condition_of(at), true);
      } else if (before.kind == StmtKind::kWhile && mentions(before.begin, before.end)) {
        bool has_break = false;
        for (StmtId inner = at + 1;
             inner < syntax.stmts.size() && syntax.stmt(inner).begin < before.block_end && may_look(); ++inner)
          has_break =
              has_break || (syntax.stmt(inner).kind == StmtKind::kPass && syntax.stmt(inner).op == word::kBreak);
        if (!has_break) add(condition_of(at), false);
      } else if (before.kind == StmtKind::kIf && mentions(before.begin, before.end)) {
        const StmtKind next = before.next == kModuleStmt ? StmtKind::kPass : syntax.stmt(before.next).kind;
        if (next != StmtKind::kElif && next != StmtKind::kElse && BlockLeaves(syntax, at, true))
          add(condition_of(at), false);
        if (next == StmtKind::kElse && BlockLeaves(syntax, before.next, true) && !BlockLeaves(syntax, at, true))
          add(condition_of(at), true);
      }
    }
  }
  CountLooks(looks);
  if (conditions.empty()) return conditions;
  // What was assigned in between: backwards, until nothing in front can be behind what was found. What more uses than
  // may be looked at stand in front of counts as assigned by the last of them.
  const uint32_t index = file.OccurrenceBeginningAt(syntax[root].begin);
  if (index == kNoIndex) return {};
  uint32_t last_bound = 0;
  const uint32_t variable = file.bindings.VariableOf(file.bindings.occurrences[index]);
  if (variable != kNoIndex) {
    const auto uses = file.occurrences().Of(variable);
    const auto begin_of = [&](uint32_t i) { return file.bindings.occurrences[i].begin; };
    const auto behind = std::ranges::lower_bound(uses, syntax[expr].begin, {}, begin_of);
    const auto first = static_cast<size_t>(behind - uses.begin());
    size_t next = first;
    for (; next > 0 && begin_of(uses[next - 1]) > last_bound; --next) {
      const Occurrence& other = file.bindings.occurrences[uses[next - 1]];
      if (first - next == kMaxLooks) {
        last_bound = other.begin;
        break;
      }
      if (other.binds() && other.kind != NameKind::kParameter) {
        const ExprId named = syntax.NamedAt(other.begin);
        const bool is_walrus = named != kNoExpr && syntax[named].parent != kNoExpr &&
                               syntax[syntax[named].parent].kind == ExprKind::kNamed;
        last_bound = std::max(last_bound, is_walrus ? syntax.stmt(syntax.StatementAt(other.begin)).begin : other.begin);
      }
      if (root != expr) {  // the attribute itself
        const ExprId read = syntax.NamedAt(other.begin);
        ExprId chain = read == kNoExpr ? kNoExpr : syntax[read].parent;
        for (int links = 0; links < kMaxLinks && chain != kNoExpr && IsLink(syntax, chain); ++links) {
          if ((syntax[chain].flags & kIsTarget) != 0 && SameChain(syntax, chain, expr))
            last_bound = std::max(last_bound, other.begin);
          chain = syntax[chain].parent;
        }
      }
    }
    CountLooks(first - next);
  }
  std::erase_if(conditions, [&](const Condition& condition) { return syntax[condition.expr].begin < last_bound; });
  return conditions;
}

int Inference::CombinedTruth(const Expr& around, int left, int right) {
  if (around.kind == ExprKind::kUnary) return left < 0 ? -1 : 1 - left;
  if (around.op == word::kAnd) return left == 0 || right == 0 ? 0 : left == 1 && right == 1 ? 1 : -1;
  return left == 1 || right == 1 ? 1 : left == 0 && right == 0 ? 0 : -1;
}

// What `not`, `and` and `or` chain is gone down in a loop, and found from the innermost outwards.
int Inference::TruthIn(const SourceFile& file, ExprId condition, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  int truth = StaticTruth(file, condition);
  if (truth >= 0 || frame == kNoFrame || condition == kNoExpr) return truth;
  std::vector<ExprId> around;
  while (IsMadeOfConditions(syntax[condition])) {
    around.push_back(condition);
    condition = syntax.ChildOf(condition, 0);
    truth = StaticTruth(file, condition);
    if (truth >= 0 || condition == kNoExpr) break;
  }
  CountLooks(around.size());
  if (truth < 0 && condition != kNoExpr) truth = FindTruthIn(file, condition, frame);
  for (size_t i = around.size(); i-- > 0;) {
    const Expr& e = syntax[around[i]];
    const int right = e.kind == ExprKind::kBoolean ? TruthIn(file, syntax.ChildOf(around[i], 1), frame) : -1;
    truth = CombinedTruth(e, truth, right);
  }
  return truth;
}

int Inference::FindTruthIn(const SourceFile& file, ExprId condition, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  const Expr& e = syntax[condition];
  switch (e.kind) {
    case ExprKind::kCompare: {
      if (e.children_count != 2) return -1;
      const auto op = static_cast<CompareOperator>(e.op);
      const ExprId right = syntax.ChildOf(condition, 1);
      const bool is_none =
          syntax[right].kind == ExprKind::kConstant && syntax[right].op == static_cast<uint8_t>(ConstantValue::kNone);
      if (!is_none)
        return Compared(ValueOf(file.id, syntax.ChildOf(condition, 0), frame), ValueOf(file.id, right, frame), op);
      if ((op != CompareOperator::kIs && op != CompareOperator::kIsNot)) return -1;
      const Value value = ValueOf(file.id, syntax.ChildOf(condition, 0), frame);
      if (!value.IsKnown() || value.doubt != 0) return -1;
      size_t nones = 0;
      for (const TypeId id : types_.TypesOf(value.set)) nones += types_[id].kind == TypeKind::kNone;
      if (nones != 0 && nones != types_.SizeOf(value.set)) return -1;
      return (nones != 0) == (op == CompareOperator::kIs) ? 1 : 0;
    }
    case ExprKind::kCall: {
      const auto children = syntax.ChildrenOf(condition);
      if (children.size() != 3 || syntax.TextOf(syntax[children[0]]) != "isinstance") return -1;
      const Value value = ValueOf(file.id, children[1], frame);
      if (!value.IsKnown() || value.doubt != 0) return -1;
      std::vector<ClassId> wanted;
      const Value classes = ValueOf(file.id, children[2], frame);
      for (const TypeId id : types_.CopyOf(classes.set)) {
        if (types_[id].kind == TypeKind::kClass) {
          wanted.push_back(types_[id].a);
        } else if (types_[id].kind == TypeKind::kTuple) {
          for (size_t i = 0; i < types_[id].args_count; ++i)
            for (const TypeId item : types_.CopyOf(types_.ArgOf(id, i)))
              if (types_[item].kind == TypeKind::kClass) wanted.push_back(types_[item].a);
        } else {
          return -1;
        }
      }
      if (wanted.empty() || classes.doubt != 0) return -1;
      size_t are = 0;
      for (const TypeId id : types_.CopyOf(value.set)) {
        const ClassId own = ClassOfType(id);
        if (own == kNoId || InfoOf(own).is_open) return -1;
        are += std::ranges::any_of(wanted, [&](ClassId cls) { return IsSubclass(own, cls); });
      }
      return are == types_.SizeOf(value.set) ? 1 : are == 0 ? 0 : -1;
    }
    case ExprKind::kName: {
      const Value value = ValueOf(file.id, condition, frame);
      if (!value.IsKnown() || value.doubt != 0) return -1;
      return !WithoutFalse(value, true).IsKnown() ? 1 : !WithoutFalse(value, false).IsKnown() ? 0 : -1;
    }
    default:
      return -1;
  }
}

// How two literals compare: 1, 0, or -1 where they are none.
int Inference::Compared(Value left, Value right, CompareOperator op) {
  const bool is_identity = op == CompareOperator::kIs || op == CompareOperator::kIsNot;
  const bool is_equality = op == CompareOperator::kEqual || op == CompareOperator::kNotEqual;
  if ((!is_identity && !is_equality) || left.doubt != 0 || right.doubt != 0 || types_.SizeOf(left.set) != 1 ||
      types_.SizeOf(right.set) != 1)
    return -1;
  const Type a = types_[types_.TypesOf(left.set)[0]], b = types_[types_.TypesOf(right.set)[0]];
  const auto known_as = [&](const Type& t) -> Text {
    const Text literal = LiteralOf(t);
    const bool is_plain = t.kind == TypeKind::kInstance && !literal.empty() && !literal.starts_with('@') &&
                          !literal.starts_with('#') && !literal.starts_with('^') && !classes_[t.a].is_enum;
    if (!is_plain) return {};
    return literal == "True" ? Text("1") : literal == "False" ? Text("0") : literal;
  };
  const Text first = known_as(a), second = known_as(b);
  // Strings may be written in many ways.
  const auto is_number = [](Text text) {
    return !text.empty() && (text[0] == '-' || (text[0] >= '0' && text[0] <= '9'));
  };
  if (first.empty() || second.empty() ||
      (first != second && (!is_number(first) || !is_number(second)) && first[0] != second[0]))
    return -1;
  const bool is_same = first == second && (is_equality || a.a == b.a);
  return is_same == (op == CompareOperator::kEqual || op == CompareOperator::kIs) ? 1 : 0;
}

// Whether a name is bound once, by a definition: what such a one stands for is true.
bool Inference::IsDefinition(const SourceFile& file, ExprId expr) {
  const uint32_t index =
      file.syntax[expr].kind == ExprKind::kName ? file.OccurrenceBeginningAt(file.syntax[expr].begin) : kNoIndex;
  const uint32_t variable = index == kNoIndex ? kNoIndex : file.bindings.VariableOf(file.bindings.occurrences[index]);
  if (variable == kNoIndex) return false;
  return is_definition_.Get(file.id, variable, [&] {
    size_t definitions = 0;
    for (const uint32_t i : file.occurrences().Of(variable)) {
      const NameKind kind = file.bindings.occurrences[i].kind;
      if (kind == NameKind::kNone) continue;
      if (kind != NameKind::kFunction && kind != NameKind::kClass) return false;
      ++definitions;
    }
    return definitions == 1;
  });
}

// Found once for each condition, and for those that it is made of.
int Inference::StaticTruth(const SourceFile& file, ExprId condition) {
  if (condition == kNoExpr) return -1;
  const FileSyntax& syntax = file.syntax;
  const auto key = [&](ExprId expr) { return (uint64_t{file.id} << 32 | expr) + 1; };
  std::vector<ExprId> around;
  const int8_t* known = truths_.Find(key(condition));
  while (known == nullptr && condition != kNoExpr && IsMadeOfConditions(syntax[condition])) {
    around.push_back(condition);
    condition = syntax.ChildOf(condition, 0);
    known = truths_.Find(key(condition));
  }
  int truth = known != nullptr ? *known : condition == kNoExpr ? -1 : FindStaticTruth(file, condition);
  if (known == nullptr && condition != kNoExpr) truths_.Put(key(condition), static_cast<int8_t>(truth));
  CountSteps(static_cast<int64_t>(around.size()));
  for (size_t i = around.size(); i-- > 0;) {
    const Expr& e = syntax[around[i]];
    const int right = e.kind == ExprKind::kBoolean ? StaticTruth(file, syntax.ChildOf(around[i], 1)) : -1;
    truth = CombinedTruth(e, truth, right);
    truths_.Put(key(around[i]), static_cast<int8_t>(truth));
  }
  return truth;
}

int Inference::FindStaticTruth(const SourceFile& file, ExprId condition) {
  const FileSyntax& syntax = file.syntax;
  const Expr& e = syntax[condition];
  const Text text = syntax.TextOf(e);
  const Version version = files_.version();
  switch (e.kind) {
    case ExprKind::kConstant:
      return e.op == static_cast<uint8_t>(ConstantValue::kTrue) ? 1 : 0;
    case ExprKind::kNumber:
      return text.find_first_not_of("0.") == Text::npos ? 0 : 1;
    case ExprKind::kName:
    case ExprKind::kAttribute:
      if (text == "TYPE_CHECKING" || text == "typing.TYPE_CHECKING" || text == "t.TYPE_CHECKING") return 1;
      if (text.ends_with("PY2")) return version.AtLeast(3, 0) ? 0 : 1;
      if (text.ends_with("PY3")) return version.AtLeast(3, 0) ? 1 : 0;
      return IsDefinition(file, condition) ? 1 : -1;
    case ExprKind::kCall: {  // sys.platform.startswith("win")
      const auto children = syntax.ChildrenOf(condition);
      if (children.size() != 2 || syntax.TextOf(syntax[children[0]]) != "sys.platform.startswith") return -1;
      const Text wanted = syntax.TextOf(syntax[children[1]]);
      return wanted.size() > 2 && Text("linux").starts_with(wanted.substr(1, wanted.size() - 2)) ? 1 : 0;
    }
    case ExprKind::kCompare: {
      if (e.children_count != 2) return -1;
      const ExprId left = syntax.ChildOf(condition, 0), right = syntax.ChildOf(condition, 1);
      const Text subject = syntax.TextOf(syntax[left]);
      const auto op = static_cast<CompareOperator>(e.op);
      const auto decide = [&](int order) {  // of the version to what it is compared with
        switch (op) {
          case CompareOperator::kEqual:
            return order == 0 ? 1 : 0;
          case CompareOperator::kNotEqual:
            return order != 0 ? 1 : 0;
          case CompareOperator::kLess:
            return order < 0 ? 1 : 0;
          case CompareOperator::kGreater:
            return order > 0 ? 1 : 0;
          case CompareOperator::kLessEqual:
            return order <= 0 ? 1 : 0;
          case CompareOperator::kGreaterEqual:
            return order >= 0 ? 1 : 0;
          default:
            return -1;
        }
      };
      if (subject == "sys.platform" || subject == "os.name") {
        const Text wanted = syntax.TextOf(syntax[right]);
        if (syntax[right].kind != ExprKind::kString || wanted.size() < 2) return -1;
        const Text own = subject == "os.name" ? "posix" : "linux";
        return decide(wanted.substr(1, wanted.size() - 2) == own ? 0 : 1);
      }
      const auto number = [&](ExprId expr) {
        int value = 0;
        const Text digits = syntax.TextOf(syntax[expr]);
        if (syntax[expr].kind != ExprKind::kNumber || digits.size() > 4) return -1;
        for (const char c : digits) {
          if (c < '0' || c > '9') return -1;
          value = value * 10 + (c - '0');
        }
        return value;
      };
      if (subject == "sys.version_info" || subject == "sys.version_info[:2]" || subject == "version_info") {
        if (syntax[right].kind != ExprKind::kTuple) return -1;
        const auto parts = syntax.ChildrenOf(right);
        for (size_t i = 0; i < parts.size() && i < 3; ++i) {
          const int wanted = number(parts[i]);
          if (wanted < 0) return -1;
          const int own = static_cast<int>(i) < version.count ? version.parts[i] : 0;
          if (own != wanted) return decide(own < wanted ? -1 : 1);
        }
        // (3, 8, 0) is more than (3, 8).
        return decide(parts.size() < 3 && subject != "sys.version_info[:2]" ? 1 : 0);
      }
      if (subject == "sys.version_info[0]" || subject == "sys.version_info.major") {
        const int wanted = number(right);
        return wanted < 0 ? -1 : decide(version.parts[0] < wanted ? -1 : version.parts[0] > wanted ? 1 : 0);
      }
      const auto is_constant = [&](ExprId expr) {
        const ExprKind kind = syntax[expr].kind;
        return kind == ExprKind::kNumber || kind == ExprKind::kString ||
               (kind == ExprKind::kConstant && syntax[expr].op != static_cast<uint8_t>(ConstantValue::kNone));
      };
      if (is_constant(left) && is_constant(right)) return Compared(ValueOf(file.id, left), ValueOf(file.id, right), op);
      if (subject == syntax.TextOf(syntax[right]) && IsDefinition(file, left)) {
        if (op == CompareOperator::kEqual || op == CompareOperator::kIs) return 1;
        if (op == CompareOperator::kNotEqual || op == CompareOperator::kIsNot) return 0;
      }
      return -1;
    }
    default:
      return -1;
  }
}

}  // namespace quillet
