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
  // A lambda that is an argument is called as its parameter says.
  if (info.lambda != kNoExpr && !is_in_frame && kind == ParameterKind::kPlain) {
    const ExprId parent = syntax[info.lambda].parent;
    const bool is_keyword = parent != kNoExpr && syntax[parent].kind == ExprKind::kKeyword;
    const ExprId call = is_keyword ? syntax[parent].parent : parent;
    const ExprId argument = is_keyword ? parent : info.lambda;
    if (call != kNoExpr && syntax[call].kind == ExprKind::kCall && syntax.ChildOf(call, 0) != argument)
      value = ParameterOfArgument(*file, call, argument, index);
    // One in the body of a class is a method.
    const ClassId cls =
        index == 0 && parent == kNoExpr ? ClassOfScope(*file, file->ScopeAt(syntax[info.lambda].begin)) : kNoId;
    if (cls != kNoId && syntax.stmt(syntax.StatementOf(info.lambda)).kind == StmtKind::kAssign)
      value = Just(InstanceOf(cls), Value::kGuessed);
  }
  if (value.IsKnown()) return value;
  if (!is_in_frame) value = GivenByFixture(info, index);
  if (!is_in_frame && !value.IsKnown()) value = GuessedParameter(id, index);
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

namespace {

// Whether a function is a fixture: decorated with `pytest.fixture` and the like, called or not.
bool IsFixture(const FileSyntax& syntax, const Stmt& stmt) {
  return stmt.kind == StmtKind::kDef && std::ranges::any_of(syntax.DecoratorsOf(stmt), [&](ExprId decorator) {
           const ExprId named = syntax[decorator].kind == ExprKind::kCall ? syntax.ChildOf(decorator, 0) : decorator;
           return syntax.NameOf(named) == "fixture" || syntax.NameOf(named) == "yield_fixture";
         });
}

}  // namespace

// As pytest looks for it: in the class, in the module, in `conftest.py` of the folder and of those around.
FunctionId Inference::FixtureOf(const FunctionInfo& info, Text name) {
  static constexpr int kMostFolders = 16;
  const SourceFile* file = FileOf(info.file);
  if (file == nullptr || file->is_stub || info.stmt == kModuleStmt || name.empty()) return kNoId;
  const Stmt& own = file->syntax.stmt(info.stmt);
  if (!file->syntax.NameOf(own).starts_with("test") && !IsFixture(file->syntax, own)) return kNoId;
  const auto find = [&](const SourceFile& in, const auto& symbols) {
    FunctionId found = kNoId;
    const auto symbol = symbols.find(name);
    if (symbol == symbols.end()) return found;
    for (const uint32_t i : in.occurrences().Of(symbol->second)) {
      const StmtId stmt = in.syntax.StatementNamedAt(in.bindings.occurrences[i].begin);
      const bool is_itself = in.id == info.file && stmt == info.stmt;
      if (stmt != kModuleStmt && !is_itself && IsFixture(in.syntax, in.syntax.stmt(stmt)))
        found = FunctionOfStmt(in.id, stmt);
    }
    return found;
  };
  FunctionId found = info.cls == kNoId ? kNoId : find(*file, MembersOf(info.cls).symbols);
  if (found == kNoId) found = find(*file, NamesOfModule(*file).symbols);
  std::string folder(FolderOf(files_.PathOf(info.file)));
  for (int i = 0; i < kMostFolders && found == kNoId && folder.size() > 1; ++i) {
    const FileId conftest = files_.NumberOf(Join(folder, "conftest.py"));
    const SourceFile* source = files_.Exists(conftest) ? FileOf(conftest) : nullptr;
    if (source != nullptr && conftest != info.file) found = find(*source, NamesOfModule(*source).symbols);
    folder = std::string(FolderOf(folder));
  }
  return found;
}

// What a test is given for a parameter by the fixture of its name: what that gives back, or gives while it waits.
Value Inference::GivenByFixture(const FunctionInfo& info, size_t index) {
  if (guess_level_ >= kMaxGuesses) {
    needs_level_ = true;
    return kUnknownValue;
  }
  const SourceFile* file = FileOf(info.file);
  if (file == nullptr || info.lambda != kNoExpr) return kUnknownValue;
  const ExprId parameter = ParametersOf(info)[index];
  if (file->syntax[parameter].op != static_cast<uint8_t>(ParameterKind::kPlain) ||
      file->syntax.ChildOf(parameter, 1) != kNoExpr)
    return kUnknownValue;
  const FunctionId fixture = FixtureOf(info, file->syntax.NameOf(parameter));
  if (fixture == kNoId) return kUnknownValue;
  Value value = ResultIn(fixture, kNoFrame);
  const uint8_t flags = functions_[fixture].flags;
  if ((flags & kIsGenerator) != 0) {
    value = IterationOf(value, (flags & kIsAsync) != 0);
  } else if ((flags & kIsAsync) != 0) {
    value = EvaluateAwait(value);
  }
  return value;
}

// Which parameter an argument of a call is given to; SIZE_MAX where that is not plain.
size_t Inference::ParameterGiven(const FunctionInfo& info, bool is_bound, const SourceFile& file, ExprId call,
                                 ExprId argument) {
  const FileSyntax& syntax = file.syntax;
  const FileSyntax& own = FileOf(info.file)->syntax;
  const auto parameters = ParametersOf(info);
  const auto kind_of = [&](size_t i) { return static_cast<ParameterKind>(own[parameters[i]].op); };
  if (syntax[argument].kind == ExprKind::kKeyword) {
    for (size_t i = 0; i < parameters.size(); ++i)
      if (kind_of(i) == ParameterKind::kPlain && own.NameOf(parameters[i]) == syntax.NameOf(argument)) return i;
    return SIZE_MAX;
  }
  size_t next = is_bound ? 1 : 0;
  for (const ExprId given : syntax.ChildrenOf(call).subspan(1)) {
    if (syntax[given].kind == ExprKind::kStarred || syntax[given].kind == ExprKind::kDoubleStarred) return SIZE_MAX;
    if (syntax[given].kind == ExprKind::kKeyword) continue;
    while (next < parameters.size() && kind_of(next) == ParameterKind::kSlash) ++next;
    if (next >= parameters.size() || kind_of(next) != ParameterKind::kPlain) return SIZE_MAX;
    if (given == argument) return next;
    ++next;
  }
  return SIZE_MAX;
}

// The arguments of a call, of which one is a function of which nothing is known.
std::vector<Argument> Inference::ArgumentsBeside(const SourceFile& file, ExprId call, ExprId unknown) {
  std::vector<Argument> arguments = ArgumentsOf(file, file.syntax.ChildrenOf(call).subspan(1), kNoFrame);
  if (file.syntax[unknown].kind == ExprKind::kKeyword) unknown = file.syntax.ChildOf(unknown, 0);
  for (Argument& argument : arguments) {
    if (argument.place.expr != unknown) continue;
    argument.value = Just(types_.Add(TypeKind::kCallable, 0, 0, {kOpenSet}));
    argument.is_evaluated = true;
  }
  return arguments;
}

// The functions that a call may call, each with whether the receiver is given: of overloads the one that fits, whatever
// one argument is.
std::vector<std::pair<FunctionId, bool>> Inference::CalledFunctions(const SourceFile& file, ExprId call,
                                                                    ExprId argument) {
  std::vector<std::pair<FunctionId, bool>> found;
  const auto children = file.syntax.ChildrenOf(call);
  std::vector<std::pair<FunctionId, bool>> overloads;
  const auto add = [&](TypeId function, bool is_bound) {
    if (types_[function].kind != TypeKind::kFunction) return;
    const FunctionId id = types_[function].a;
    ((functions_[id].flags & kIsOverload) != 0 ? overloads : found)
        .emplace_back(id, is_bound || types_[function].args_count > 0);
  };
  for (const TypeId id : types_.CopyOf(ValueOf(file.id, children[0]).set)) {
    if (types_[id].kind != TypeKind::kClass) {
      add(id, false);
      continue;
    }
    for (const Text name : {Text("__init__"), Text("__new__")}) {
      const auto constructor = FindMember(types_[id].a, name);
      if (!constructor || constructor->owner == ClassNamed("builtins", "object")) continue;
      for (const TypeId function : types_.CopyOf(RawValueOfMember(*constructor, name).set)) add(function, true);
      break;
    }
  }
  int best = -1;
  std::ranges::sort(overloads);
  std::pair<FunctionId, bool> chosen{kNoId, false};
  for (const auto& [id, is_bound] : overloads) {
    std::vector<Argument> arguments = ArgumentsBeside(file, call, argument);
    Solution solution;
    const int score = MatchArguments(id, is_bound, arguments, solution, nullptr);
    if (score <= best) continue;
    best = score;
    chosen = {id, is_bound};
  }
  if (chosen.first != kNoId) found.push_back(chosen);
  return found;
}

// What a function that is an argument of a call is called with, as the parameter that it is given to says.
Value Inference::ParameterOfArgument(const SourceFile& file, ExprId call, ExprId argument, size_t index) {
  Value value;
  bool is_known = true;
  for (const auto& [id, is_bound] : CalledFunctions(file, call, argument)) {
    const FunctionInfo info = functions_[id];
    const size_t at = ParameterGiven(info, is_bound, file, call, argument);
    const ExprId hint = at == SIZE_MAX ? kNoExpr : HintOfParameter(*FileOf(info.file), info, at);
    const Value stated = hint == kNoExpr ? kUnknownValue : ValueOfHint(info.file, hint);
    bool is_said = false;
    for (const TypeId form : types_.CopyOf(stated.set)) {
      if (types_[form].kind != TypeKind::kCallable || index + 1 >= types_[form].args_count) continue;
      // The others say what type variables are.
      std::vector<Argument> arguments = ArgumentsBeside(file, call, argument);
      Solution solution;
      MatchArguments(id, is_bound, arguments, solution, nullptr);
      value = types_.Union(value, Substitute({types_.ArgOf(form, index + 1), 0}, solution, true));
      is_said = true;
    }
    is_known = is_known && is_said;
  }
  if (!value.IsKnown() || !is_known) return value.IsKnown() ? Value{value.set, Value::kOpen} : kUnknownValue;
  return value;
}

// Adds the calls of a function: those by its name, and those of what it is given on to.
void Inference::FindCalls(FunctionId id, std::vector<ExprPlace>& calls, int depth) {
  const FunctionInfo info = functions_[id];
  for (const ExprPlace& call : callers_->CallsOf(info)) calls.push_back(call);
  const SourceFile* file = FileOf(info.file);
  if (file == nullptr || file->is_stub) return;
  if (info.lambda != kNoExpr) {
    FindCallsOfUse(*file, info.lambda, calls, depth);
  } else if (info.scope != kNoIndex) {
    const StmtId around = file->syntax.stmt(info.stmt).parent;
    // One of a module or class is called by its name.
    bool is_inner = false;
    for (StmtId at = around; at != kModuleStmt && !is_inner; at = file->syntax.stmt(at).parent)
      is_inner = file->syntax.stmt(at).kind == StmtKind::kDef;
    const uint32_t index = file->OccurrenceBeginningAt(file->syntax.stmt(info.stmt).name_begin);
    if (index == kNoIndex) return;
    FindCallsOfName(*file, index, calls, is_inner ? depth : depth + 1);
  }
}

void Inference::FindCallsOfName(const SourceFile& file, uint32_t occurrence, std::vector<ExprPlace>& calls, int depth) {
  const uint32_t variable = file.bindings.VariableOf(file.bindings.occurrences[occurrence]);
  if (variable == kNoIndex) return;
  static constexpr size_t kMaxUses = 40;
  size_t count = 0;
  for (const uint32_t i : file.occurrences().Of(variable)) {
    const Occurrence& use = file.bindings.occurrences[i];
    if (use.binds() || ++count > kMaxUses) continue;
    const ExprId named = file.syntax.NamedAt(use.begin);
    if (named != kNoExpr) FindCallsOfUse(file, named, calls, depth);
  }
}

// The same of what an expression stands for.
void Inference::FindCallsOfUse(const SourceFile& file, ExprId use, std::vector<ExprPlace>& calls, int depth) {
  static constexpr int kMaxGivenOn = 4;
  static constexpr size_t kMostCalls = 64;
  if (depth >= kMaxGivenOn || calls.size() >= kMostCalls) return;
  const FileSyntax& syntax = file.syntax;
  ExprId parent = syntax[use].parent;
  const StmtId at = syntax.StatementOf(use);
  const Stmt& stmt = syntax.stmt(at);
  // What a function gives back is what its calls are.
  const auto returned_by = [&](FunctionId id) {
    if (id == kNoId) return;
    std::vector<ExprPlace> outer;
    FindCalls(id, outer, depth + 1);
    for (const ExprPlace& call : outer) {
      const SourceFile* other = FileOf(call.file);
      if (other == nullptr) continue;
      const StmtId decorated = other->syntax.StatementOf(call.expr);
      const auto decorators = other->syntax.DecoratorsOf(other->syntax.stmt(decorated));
      const bool is_decorator = std::ranges::find(decorators, call.expr) != decorators.end();
      if (is_decorator && other->syntax[call.expr].kind == ExprKind::kCall) {
        calls.push_back(call);
      } else if (!is_decorator) {
        FindCallsOfUse(*other, call.expr, calls, depth + 1);
      }
      if (is_decorator && other->syntax.stmt(decorated).kind == StmtKind::kDef && IsCalledBy(*other, call.expr, id)) {
        const FunctionInfo info = functions_[FunctionOfStmt(call.file, decorated)];
        for (const ExprPlace& named : callers_->CallsOf(info)) calls.push_back(named);
      }
    }
  };
  if (parent != kNoExpr) {
    ExprId argument = use;
    if (syntax[parent].kind == ExprKind::kKeyword) {
      argument = parent;
      parent = syntax[parent].parent;
    }
    if (parent == kNoExpr) return;
    if (syntax[parent].kind == ExprKind::kLambda && syntax.ChildrenOf(parent).back() == use)
      return returned_by(FunctionOfLambda(file.id, parent));
    if (syntax[parent].kind != ExprKind::kCall) return;
    if (syntax.ChildOf(parent, 0) == use) {
      calls.push_back({file.id, parent});
      return;
    }
    // Called by what it is given to.
    for (const auto& [id, is_bound] : CalledFunctions(file, parent, argument)) {
      const FunctionInfo info = functions_[id];
      const SourceFile* other = FileOf(info.file);
      const size_t index = other->is_stub ? SIZE_MAX : ParameterGiven(info, is_bound, file, parent, argument);
      if (index == SIZE_MAX) continue;
      const uint32_t occurrence = other->OccurrenceBeginningAt(other->syntax[ParametersOf(info)[index]].name_begin);
      if (occurrence != kNoIndex) FindCallsOfName(*other, occurrence, calls, depth + 1);
    }
    return;
  }
  const auto exprs = syntax.ExprsOf(stmt);
  if (stmt.kind == StmtKind::kAssign && exprs.size() == 2 && exprs[1] == use &&
      syntax[exprs[0]].kind == ExprKind::kName) {
    const uint32_t occurrence = file.OccurrenceBeginningAt(syntax[exprs[0]].begin);
    if (occurrence != kNoIndex) FindCallsOfName(file, occurrence, calls, depth + 1);
  } else if (stmt.kind == StmtKind::kReturn && !exprs.empty() && exprs[0] == use) {
    StmtId around = stmt.parent;
    while (around != kModuleStmt && syntax.stmt(around).kind != StmtKind::kDef) around = syntax.stmt(around).parent;
    if (around != kModuleStmt) returned_by(FunctionOfStmt(file.id, around));
  }
}

// Whether a decorator is the function, or gives it.
bool Inference::IsCalledBy(const SourceFile& file, ExprId decorator, FunctionId id) {
  const auto types = types_.CopyOf(ValueOf(file.id, decorator).set);
  return std::ranges::any_of(
      types, [&](TypeId type) { return types_[type].kind == TypeKind::kFunction && types_[type].a == id; });
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
    if (guess_level_ + 1 < kMaxGuesses) {
      ++guess_level_;
      const Value value = GuessParameters(id);
      --guess_level_;
      return value;
    }
    // The last one takes what is sure, and pays for that as guesses do.
    Value value;
    bool needs_level = false;
    {
      const Afresh afresh(*this, kMaxDepth, true);
      value = GuessParameters(id);
      needs_level = needs_level_;
    }
    needs_level_ = needs_level;
    return value;
  });
  if (!all.IsKnown()) return kUnknownValue;
  return {types_.ArgOf(types_.TypesOf(all.set)[0], index), Value::kGuessed | Value::kOpen};
}

// A tuple of what each is given.
Value Inference::GuessParameters(FunctionId id) {
  const FunctionInfo info = functions_[id];
  std::vector<ExprPlace> calls;
  FindCalls(id, calls, 0);
  // By paths: numbers of files are in the order in which they were met.
  std::ranges::sort(calls, {}, [&](const ExprPlace& at) { return std::pair(Text(files_.PathOf(at.file)), at.expr); });
  const auto is_same = [](const ExprPlace& a, const ExprPlace& b) { return a.file == b.file && a.expr == b.expr; };
  calls.erase(std::unique(calls.begin(), calls.end(), is_same), calls.end());
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
  if (has_return) {
    // The end of it is a way out as well.
    const std::function<int(ExprId)> truth = [&](ExprId condition) { return TruthIn(*file, condition, frame); };
    const std::function<bool(ExprId)> returns = [&](ExprId expr) {
      if (syntax[expr].kind != ExprKind::kCall) return true;
      const ExprId callee = syntax.ChildOf(expr, 0);
      const Text called =
          syntax[callee].kind == ExprKind::kAttribute ? syntax.NameOf(callee) : syntax.TextOf(syntax[callee]);
      static constexpr Text kLast[] = {"exit", "_exit", "abort", "fail", "skip", "quit", "error"};
      return std::ranges::find(kLast, called) == std::end(kLast);
    };
    return is_over || !MayEnd(syntax, info.stmt, truth, returns) ? value : types_.Union(value, NoneValue());
  }
  // One that always raises, or that a subclass has to write, says nothing.
  if (raises_only || (info.flags & kIsAbstract) != 0) return kUnknownValue;
  return NoneValue();
}

// The `yield`s of a function, in the order of the source.
std::vector<ExprId> Inference::YieldsOf(const FunctionInfo& info) {
  const SourceFile* file = FileOf(info.file);
  const FileSyntax& syntax = file->syntax;
  const Stmt& own = syntax.stmt(info.stmt);
  std::vector<ExprId> found;
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
    const Expr& at = syntax[expr];
    if ((at.kind != ExprKind::kYield && at.kind != ExprKind::kYieldFrom) || at.begin < own.end ||
        at.begin >= own.block_end)
      continue;
    uint32_t scope = file->ScopeAt(at.begin);
    while (scope != kNoIndex && file->bindings.scopes[scope].kind == NameScopeKind::kComprehension)
      scope = file->bindings.scopes[scope].parent;
    if (scope == info.scope) found.push_back(expr);
  }
  return found;
}

Value Inference::YieldedIn(FunctionId id, FrameId frame) {
  const FunctionInfo info = functions_[id];
  const FileSyntax& syntax = FileOf(info.file)->syntax;
  Value value;
  for (const ExprId expr : YieldsOf(info)) {
    const ExprId given = syntax.ChildOf(expr, 0);
    const Value one = given == kNoExpr ? NoneValue() : ValueOf(info.file, given, frame);
    value = types_.Union(value, syntax[expr].kind == ExprKind::kYieldFrom ? IterationOf(one) : one);
    if (IsInVain(value)) return kUnknownValue;
  }
  return value;
}

std::vector<Value> Inference::YieldedInOrder(FunctionId id, FrameId frame, int depth) {
  const FunctionInfo info = functions_[id];
  const FileSyntax& syntax = FileOf(info.file)->syntax;
  std::vector<Value> items;
  std::vector<ExprId> yields = YieldsOf(info);
  std::ranges::sort(yields, {}, [&](ExprId expr) { return syntax[expr].begin; });
  for (const ExprId expr : yields) {
    // Each once: no loop, condition or other statement is around it.
    const Stmt& stmt = syntax.stmt(syntax.StatementOf(expr));
    const auto exprs = syntax.ExprsOf(stmt);
    if (stmt.parent != info.stmt || exprs.empty() || exprs.back() != expr) return {};
    const ExprId given = syntax.ChildOf(expr, 0);
    const Value one = given == kNoExpr ? NoneValue() : ValueOf(info.file, given, frame);
    if (syntax[expr].kind == ExprKind::kYield) {
      items.push_back(one);
      continue;
    }
    const auto all =
        types_.SizeOf(one.set) == 1 ? ItemsInOrder(types_.TypesOf(one.set)[0], depth + 1) : std::vector<Value>();
    if (all.empty()) return {};
    items.insert(items.end(), all.begin(), all.end());
  }
  return items;
}

std::vector<Value> Inference::ItemsInOrder(TypeId id, int depth) {
  static constexpr int kMaxNesting = 3;
  const Text literal = LiteralOf(types_[id]);
  if (depth > kMaxNesting) return {};
  if (types_[id].kind == TypeKind::kTuple) {
    std::vector<Value> items;
    for (size_t i = 0; i < types_[id].args_count; ++i) items.emplace_back(types_.ArgOf(id, i), 0);
    return items;
  }
  if (!literal.starts_with('^')) return {};
  const size_t colon = literal.find(':');
  const auto number = [](Text text) {
    uint32_t result = 0;
    for (const char c : text) result = result * 10 + static_cast<uint32_t>(c - '0');
    return result;
  };
  return YieldedInOrder(number(literal.substr(1, colon - 1)), number(literal.substr(colon + 1)), depth);
}

// The classes of its file whose statement names a class as a base.
std::vector<ClassId> Inference::ClassesBelow(ClassId cls) {
  static constexpr size_t kMaxClasses = 16;
  const ClassInfo& info = InfoOf(cls);
  const SourceFile* file = FileOf(info.file);
  if (info.name.empty() || file == nullptr || file->is_stub) return {};
  const Text name = info.name;
  const FileId id = info.file;
  const FileSyntax& syntax = file->syntax;
  std::vector<ClassId> found;
  for (StmtId stmt = 1; stmt < syntax.stmts.size() && found.size() < kMaxClasses; ++stmt) {
    if (syntax.stmt(stmt).kind != StmtKind::kClass) continue;
    const auto bases = syntax.ArgumentsOf(syntax.stmt(stmt));
    if (std::ranges::none_of(bases, [&](ExprId base) { return syntax.NameOf(base) == name; })) continue;
    const ClassId below = ClassOfStmt(id, stmt);
    if (below != cls && IsSubclass(below, cls)) found.push_back(below);
  }
  return found;
}

// What the methods give that override one that gives nothing itself.
Value Inference::ResultBelow(FunctionId id) {
  const FunctionInfo info = functions_[id];
  if (info.cls == kNoId) return kUnknownValue;
  if (guess_level_ >= kMaxGuesses) {
    needs_level_ = true;
    return kUnknownValue;
  }
  const Text name = Kept(FileOf(info.file)->syntax.NameOf(FileOf(info.file)->syntax.stmt(info.stmt)));
  Value value;
  for (const ClassId below : ClassesBelow(info.cls)) {
    const auto member = FindMember(below, name);
    if (!member || member->owner == info.cls) continue;
    for (const TypeId function : types_.CopyOf(RawValueOfMember(*member, name).set))
      if (types_[function].kind == TypeKind::kFunction)
        value = types_.Union(value, ResultIn(types_[function].a, kNoFrame));
  }
  value.doubt |= Value::kGuessed | Value::kOpen;
  return value;
}

// An attribute that a class lacks and those of its file below it have.
Value Inference::AttributeBelow(ClassId cls, Text name) {
  if (name.starts_with("__") && name.ends_with("__")) return kUnknownValue;
  if (guess_level_ >= kMaxGuesses) {
    needs_level_ = true;
    return kUnknownValue;
  }
  Value value;
  for (const ClassId below : ClassesBelow(cls))
    if (const auto member = FindMember(below, name))
      value = types_.Union(value, ValueOfMember(*member, name, InstanceOf(below), false));
  value.doubt |= Value::kGuessed | Value::kOpen;
  return value;
}

// Whether a method says that classes below write it.
bool Inference::IsLeftToOthers(FunctionId id) {
  const FunctionInfo info = functions_[id];
  if (info.cls == kNoId || info.lambda != kNoExpr) return false;
  if ((info.flags & kIsAbstract) != 0) return true;
  const FileSyntax& syntax = FileOf(info.file)->syntax;
  for (StmtId at = syntax.stmt(info.stmt).first_child; at != kModuleStmt; at = syntax.stmt(at).next) {
    const auto exprs = syntax.ExprsOf(syntax.stmt(at));
    if (syntax.stmt(at).kind == StmtKind::kRaise && !exprs.empty() &&
        syntax.TextOf(syntax[exprs[0]]).starts_with("NotImplementedError"))
      return true;
  }
  return false;
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
    Value returned = ReturnedIn(id, frame);
    if (!returned.IsKnown() && IsLeftToOthers(id)) returned = ResultBelow(id);
    if ((flags & kIsGenerator) != 0) {
      const Value yielded = YieldedIn(id, frame);
      if ((flags & kIsAsync) != 0) return InstanceNamed("typing", "AsyncGenerator", {yielded.Packed(), kNoTypes});
      const ClassId generator = ClassNamed("typing", "Generator");
      if (generator == kNoId) return kUnknownValue;
      // One that yields a few values in a row remembers itself, for `a, b = f()`.
      const uint32_t itself = YieldedInOrder(id, frame).size() > 1
                                  ? LiteralNumber("^" + std::to_string(id) + ":" + std::to_string(frame))
                                  : 0;
      const TypeSetId args[] = {yielded.Packed(), kNoTypes, returned.Packed()};
      return Just(types_.Add(TypeKind::kInstance, generator, itself, args));
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
