// Parameters and results of functions.
#include <algorithm>

#include "inference/flow.h"
#include "inference/inference.h"
#include "inference/remembered.h"

namespace quillet {

// An annotation, a type comment behind the parameter, or its part of a signature comment.
ExprId Inference::HintOfParameter(const SourceFile& file, const FunctionInfo& info, size_t index) {
  const FileSyntax& syntax = file.syntax;
  const auto parameters = ParametersOf(info);
  const ExprId own = syntax.ChildOf(parameters[index], 0);
  if (own != kNoExpr || info.lambda != kNoExpr) return own;
  const ExprId signature = syntax.stmt(info.stmt).hint;
  if (signature == kNoExpr || syntax[signature].kind != ExprKind::kSignatureHint) return kNoExpr;
  const auto hints = syntax.ChildrenOf(signature);
  if (hints.size() < 2) return kNoExpr;
  const size_t count = hints.size() - 1;
  // One that leaves out `self` speaks of the parameters behind it.
  const size_t left_out = parameters.size() > count ? parameters.size() - count : 0;
  if (left_out > 1 || index < left_out || index - left_out >= count) return kNoExpr;
  const ExprId hint = hints[index - left_out];
  const ExprKind kind = syntax[hint].kind;
  if (kind == ExprKind::kConstant && syntax[hint].op == static_cast<uint8_t>(ConstantValue::kEllipsis)) return kNoExpr;
  return kind == ExprKind::kStarred || kind == ExprKind::kDoubleStarred ? syntax.ChildOf(hint, 0) : hint;
}

// What the first parameter of a method is.
Value Inference::SelfOf(const FunctionInfo& info) {
  std::vector<TypeSetId> args;
  const std::vector<TypeId> parameters = InfoOf(info.cls).parameters;
  for (const TypeId parameter : parameters) args.push_back(types_.SetOf(parameter));
  if ((info.flags & kIsClassMethod) != 0 || ((info.flags & kIsStatic) != 0 && info.cls != kNoId))
    return Just(types_.Add(TypeKind::kClass, info.cls, 0, args));
  return Just(InstanceOf(info.cls, args));
}

Value Inference::ValueOfParameter(FunctionId id, size_t index, FrameId frame) {
  const FunctionInfo info = functions_[id];
  const SourceFile* file = FileOf(info.file);
  const FileSyntax& syntax = file->syntax;
  const auto parameters = ParametersOf(info);
  if (index >= parameters.size()) return kUnknownValue;
  const Expr& parameter = syntax[parameters[index]];
  const auto kind = static_cast<ParameterKind>(parameter.op);
  const auto gathered = [&](Value one) {
    if (kind == ParameterKind::kStar) return InstanceNamed("builtins", "tuple", {one.Packed()});
    if (kind == ParameterKind::kDoubleStar)
      return InstanceNamed("builtins", "dict", {InstanceNamed("builtins", "str").set, one.Packed()});
    return one;
  };
  const bool is_in_frame =
      frame != kNoFrame && frames_[frame].function == id && index < frames_[frame].parameters.size();
  // A receiver that is known is more than its own class.
  const bool is_self = index == 0 && info.cls != kNoId && kind == ParameterKind::kPlain && info.lambda == kNoExpr &&
                       ((info.flags & kIsStatic) == 0 || syntax.NameOf(syntax.stmt(info.stmt)) == "__new__");
  if (is_self && is_in_frame && frames_[frame].parameters[0].IsKnown()) return frames_[frame].parameters[0];
  if (const ExprId hint = HintOfParameter(*file, info, index); hint != kNoExpr) {
    const Value value = ValueOfHint(info.file, hint);
    if (value.IsKnown()) return gathered(value);
  }
  if (is_in_frame && frames_[frame].parameters[index].IsKnown()) return frames_[frame].parameters[index];
  if (is_self) return SelfOf(info);
  Value value = is_in_frame ? kUnknownValue : ValueInDocstring(info, syntax.NameOf(parameters[index]));
  if (value.IsKnown()) return value;
  if (!is_in_frame) value = GuessedParameter(id, index);
  if (value.IsKnown()) value.doubt |= Value::kGuessed | Value::kOpen;
  if (kind != ParameterKind::kPlain) return value.IsKnown() ? value : gathered(kUnknownValue);
  const ExprId otherwise = syntax.ChildOf(parameters[index], 1);
  if (otherwise != kNoExpr) {
    Value given = ValueOf(info.file, otherwise);
    given.doubt |= Value::kOpen | Value::kGuessed;
    value = types_.Union(value, given);
  }
  return value;
}

// What the calls of a function in the project give a parameter.
Value Inference::GuessedParameter(FunctionId id, size_t index) {
  if (callers_ == nullptr) return kUnknownValue;
  if (guess_level_ >= kMaxGuesses) {
    needs_level_ = true;
    return kUnknownValue;
  }
  const InFrame in_frame(*this, kNoFrame);
  const Value all = Remembered(guesses_, KeyOf(0, id, 0), [&] {
    ++guess_level_;
    const Value value = GuessParameters(id);
    --guess_level_;
    return value;
  });
  if (!all.IsKnown()) return kUnknownValue;
  return {types_.ArgOf(types_.TypesOf(all.set)[0], index), Value::kGuessed | Value::kOpen};
}

// A tuple of what each is given.
Value Inference::GuessParameters(FunctionId id) {
  const FunctionInfo info = functions_[id];
  const std::vector<ExprPlace> calls = callers_->CallsOf(info);
  std::vector<Value> parameters(ParametersOf(info).size());
  for (const ExprPlace& call : calls) {
    const SourceFile* file = FileOf(call.file);
    if (file == nullptr) continue;
    const FileSyntax& syntax = file->syntax;
    const StmtId stmt = syntax.StatementOf(call.expr);
    const auto decorators = syntax.DecoratorsOf(syntax.stmt(stmt));
    const bool decorates = std::ranges::find(decorators, call.expr) != decorators.end();
    const auto children = syntax.ChildrenOf(call.expr);
    if (!decorates && children.empty()) continue;
    const Value callee = ValueOf(call.file, decorates ? call.expr : children[0]);
    for (const TypeId type : types_.CopyOf(callee.set)) {
      const Type t = types_[type];
      bool is_bound = t.args_count > 0;
      if (t.kind == TypeKind::kClass) {  // its constructor
        if (!IsSubclass(t.a, info.cls) && t.a != info.cls) continue;
        is_bound = true;
      } else if (t.kind != TypeKind::kFunction || t.a != id) {
        continue;
      }
      std::vector<Argument> arguments;
      if (decorates) {
        arguments.emplace_back();
        arguments[0].value = DecoratedBelow(*file, stmt, call.expr);
        arguments[0].is_evaluated = true;
      } else {
        arguments = ArgumentsOf(*file, children.subspan(1), kNoFrame);
      }
      Solution solution;
      std::vector<Value> given;
      if (MatchArguments(id, is_bound, arguments, solution, &given) < 0) continue;
      for (size_t i = 0; i < given.size() && i < parameters.size(); ++i)
        parameters[i] = types_.Union(parameters[i], given[i]);
    }
  }
  std::vector<TypeSetId> sets;
  for (const Value& value : parameters) sets.push_back(value.Packed());
  return Just(types_.Add(TypeKind::kTuple, 0, 0, sets));
}

Value Inference::StatedResult(FunctionId id, FrameId frame, bool& is_stated) {
  const FunctionInfo info = functions_[id];
  is_stated = false;
  if (info.lambda != kNoExpr) return kUnknownValue;
  const SourceFile* file = FileOf(info.file);
  const ExprId hint = file->syntax.stmt(info.stmt).hint;
  if (hint == kNoExpr) return kUnknownValue;
  Value value = ValueOfHint(info.file, hint, frame);
  is_stated = true;
  const bool is_generator = (info.flags & kIsGenerator) != 0;
  if ((info.flags & kIsAsync) != 0 && !is_generator && !(file->is_stub && (info.flags & kIsAsync) == 0))
    value = InstanceNamed("typing", "Coroutine", {kNoTypes, kNoTypes, value.Packed()});
  return value;
}

// Whether a statement runs in every call of its function in a frame: 1, in none: 0; otherwise -1.
int Inference::IsReached(const SourceFile& file, StmtId stmt, StmtId function, FrameId frame) {
  const FileSyntax& syntax = file.syntax;
  bool is_sure = true;
  const auto truth_of = [&](StmtId clause) {
    const auto exprs = syntax.ExprsOf(syntax.stmt(clause));
    return exprs.empty() ? -1 : TruthIn(file, exprs[0], frame);
  };
  for (; stmt != function && stmt != kModuleStmt; stmt = syntax.stmt(stmt).parent) {
    switch (syntax.stmt(stmt).kind) {
      case StmtKind::kIf:
      case StmtKind::kElif:
      case StmtKind::kElse: {
        if (syntax.stmt(stmt).kind != StmtKind::kElse) {
          const int truth = truth_of(stmt);
          if (truth == 0) return 0;
          is_sure = is_sure && truth == 1;
        }
        for (StmtId at = stmt; ContinuesChain(syntax.stmt(at).kind);) {
          at = syntax.stmt(at).previous;
          const StmtKind kind = syntax.stmt(at).kind;
          if (at == kModuleStmt) break;
          if (kind != StmtKind::kIf && kind != StmtKind::kElif) {
            is_sure = false;  // the `else` of a loop or of a `try`
            break;
          }
          const int truth = truth_of(at);
          if (truth == 1) return 0;
          is_sure = is_sure && truth == 0;
        }
        break;
      }
      case StmtKind::kReturn:
      case StmtKind::kWith:
        break;
      default:
        is_sure = false;
    }
  }
  return is_sure ? 1 : -1;
}

Value Inference::ReturnedIn(FunctionId id, FrameId frame) {
  const FunctionInfo info = functions_[id];
  const SourceFile* file = FileOf(info.file);
  const FileSyntax& syntax = file->syntax;
  if (info.lambda != kNoExpr) {
    const auto children = syntax.ChildrenOf(info.lambda);
    return children.empty() ? kUnknownValue : ValueOf(info.file, children.back(), frame);
  }
  if (file->is_stub) return kUnknownValue;
  const Stmt& own = syntax.stmt(info.stmt);
  Value value;
  bool has_return = false, raises_only = false;
  StmtId skipped_to = kModuleStmt;
  bool is_over = false;
  for (StmtId stmt = info.stmt + 1; stmt < syntax.stmts.size() && syntax.stmt(stmt).begin < own.block_end && !is_over;
       ++stmt) {
    const Stmt& at = syntax.stmt(stmt);
    if (skipped_to != kModuleStmt && at.begin < syntax.stmt(skipped_to).block_end) continue;
    if (at.kind == StmtKind::kDef || at.kind == StmtKind::kClass) {
      skipped_to = stmt;
      continue;
    }
    if (at.kind == StmtKind::kRaise && at.parent == info.stmt) raises_only = true;
    if (at.kind != StmtKind::kReturn || !IsReachable(*file, stmt)) continue;
    const int reached = IsReached(*file, stmt, info.stmt, frame);
    if (reached == 0) continue;
    is_over = reached == 1;  // nothing behind it runs
    const auto exprs = syntax.ExprsOf(at);
    has_return = true;
    value = types_.Union(value, exprs.empty() ? NoneValue() : ValueOf(info.file, exprs[0], frame));
    if (IsInVain(value)) return kUnknownValue;
  }
  if (has_return) return value;
  // One that always raises, or that a subclass has to write, says nothing.
  if (raises_only || (info.flags & kIsAbstract) != 0) return kUnknownValue;
  return NoneValue();
}

Value Inference::YieldedIn(FunctionId id, FrameId frame) {
  const FunctionInfo info = functions_[id];
  const SourceFile* file = FileOf(info.file);
  const FileSyntax& syntax = file->syntax;
  const Stmt& own = syntax.stmt(info.stmt);
  Value value;
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
    const Expr& at = syntax[expr];
    if ((at.kind != ExprKind::kYield && at.kind != ExprKind::kYieldFrom) || at.begin < own.end ||
        at.begin >= own.block_end)
      continue;
    uint32_t scope = file->ScopeAt(at.begin);
    while (scope != kNoIndex && file->bindings.scopes[scope].kind == NameScopeKind::kComprehension)
      scope = file->bindings.scopes[scope].parent;
    if (scope != info.scope) continue;
    const ExprId given = syntax.ChildOf(expr, 0);
    const Value one = given == kNoExpr ? NoneValue() : ValueOf(info.file, given, frame);
    value = types_.Union(value, at.kind == ExprKind::kYieldFrom ? IterationOf(one) : one);
    if (IsInVain(value)) return kUnknownValue;
  }
  return value;
}

Value Inference::ResultIn(FunctionId id, FrameId frame) {
  const InFrame in_frame(*this, frame);
  return Remembered(results_, KeyOf(0, id, frame), [&]() -> Value {
    bool is_stated = false;
    const Value stated = StatedResult(id, frame, is_stated);
    if (is_stated && (stated.IsKnown() || (stated.doubt & Value::kOpen) == 0)) return stated;
    const uint8_t flags = functions_[id].flags;
    const Value documented = ValueInDocstring(functions_[id], {});
    if (documented.IsKnown()) return documented;
    const Value returned = ReturnedIn(id, frame);
    if ((flags & kIsGenerator) != 0) {
      const Value yielded = YieldedIn(id, frame);
      if ((flags & kIsAsync) != 0) return InstanceNamed("typing", "AsyncGenerator", {yielded.Packed(), kNoTypes});
      return InstanceNamed("typing", "Generator", {yielded.Packed(), kNoTypes, returned.Packed()});
    }
    if ((flags & kIsAsync) != 0) return InstanceNamed("typing", "Coroutine", {kNoTypes, kNoTypes, returned.Packed()});
    return returned;
  });
}

Value Inference::ResultOfFunction(FunctionId function) { return ResultIn(function, kNoFrame); }

FrameId Inference::FrameOf(FunctionId function, FrameId outer, std::vector<Value> parameters) {
  const bool is_empty = std::ranges::none_of(parameters, [](Value value) { return value.IsKnown(); });
  if (is_empty && outer == kNoFrame) return kNoFrame;
  const bool is_open = std::ranges::any_of(parameters, [](Value value) { return value.doubt != 0; });
  if (guess_level_ == kMaxGuesses && is_open && outer == kNoFrame) return kNoFrame;  // nothing sure comes of it
  const int depth = frames_[outer].depth + 1, calls = frames_[frame_].calls + 1;
  if (frames_.size() >= kMaxFrames || depth > kMaxFrameDepth || calls > kMaxCalls) return kNoFrame;
  uint64_t hash = (uint64_t{function} * 0x9E3779B97F4A7C15u + outer) * 8 + static_cast<uint64_t>(calls);
  for (const Value& value : parameters)
    hash = (hash ^ value.set ^ uint64_t{value.doubt} << 40) * 0x9E3779B97F4A7C15u + 1;
  std::vector<FrameId>& same = frames_by_hash_[hash];
  for (const FrameId frame : same)
    if (frames_[frame].function == function && frames_[frame].outer == outer && frames_[frame].calls == calls &&
        frames_[frame].parameters == parameters)
      return frame;
  const auto frame = static_cast<FrameId>(frames_.size());
  frames_.push_back({function, outer, depth, calls, std::move(parameters)});
  same.push_back(frame);
  return frame;
}

}  // namespace quillet
