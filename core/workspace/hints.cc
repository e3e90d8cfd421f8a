// Hints within lines: what is not written, and not plain to see.
#include <algorithm>

#include "workspace/workspace_impl.h"

namespace quillet {

namespace {

constexpr size_t kMostText = 60;

// Whether everybody sees what it is: a display, a constant, or what a class is called for.
bool IsPlain(const FileSyntax& syntax, ExprId value) {
  switch (syntax[value].kind) {
    case ExprKind::kNumber:
    case ExprKind::kString:
    case ExprKind::kConstant:
    case ExprKind::kLambda:
    case ExprKind::kCompare:
      return true;
    case ExprKind::kCall: {
      const Text name = syntax.NameOf(syntax.ChildOf(value, 0));
      return !name.empty() && name.front() >= 'A' && name.front() <= 'Z';
    }
    default:
      return false;
  }
}

}  // namespace

void Workspace::Impl::AddParameterHints(const SourceFile& file, ExprId call, std::vector<InlineHint>& hints) {
  const FileSyntax& syntax = file.syntax;
  const auto children = syntax.ChildrenOf(call);
  const auto is_bare = [&](ExprId argument) {
    const ExprKind kind = syntax[argument].kind;
    return kind == ExprKind::kNumber || kind == ExprKind::kString || kind == ExprKind::kConstant ||
           kind == ExprKind::kList || kind == ExprKind::kDict || kind == ExprKind::kLambda;
  };
  if (std::ranges::none_of(children.subspan(1), is_bare)) return;
  const Value callee = inference.ValueOf(file.id, children[0]);
  const TypeList types = inference.types().CopyOf(callee.set);
  if (types.size() != 1) return;
  Type type = inference.types()[types[0]];
  bool is_bound = type.args_count > 0;
  if (type.kind == TypeKind::kClass) {
    const auto constructor = inference.FindMember(type.a, "__init__");
    if (!constructor || constructor->owner == inference.ClassNamed("builtins", "object")) return;
    const Value init = inference.AttributeOf(inference.Just(inference.InstanceOf(type.a)), "__init__");
    const TypeList inits = inference.types().CopyOf(init.set);
    if (inits.size() != 1) return;
    type = inference.types()[inits[0]];
    is_bound = true;
  }
  if (type.kind != TypeKind::kFunction) return;
  const FunctionInfo info = inference.function(type.a);
  const SourceFile* source = Get(info.file);
  const auto parameters = inference.ParametersOf(info);
  size_t at = is_bound ? 1 : 0;
  for (const ExprId argument : children.subspan(1)) {
    const ExprKind kind = syntax[argument].kind;
    if (kind == ExprKind::kStarred || kind == ExprKind::kDoubleStarred || kind == ExprKind::kKeyword) return;
    while (at < parameters.size() &&
           static_cast<ParameterKind>(source->syntax[parameters[at]].op) == ParameterKind::kSlash)
      ++at;
    if (at >= parameters.size() ||
        static_cast<ParameterKind>(source->syntax[parameters[at]].op) != ParameterKind::kPlain)
      return;
    const Text name = source->syntax.NameOf(parameters[at++]);
    // Names with underscores in front are not for callers, nor are those of one letter.
    if (!is_bare(argument) || name.size() < 2 || name.starts_with('_')) continue;
    InlineHint hint;
    hint.offset = syntax[argument].begin;
    hint.text = std::string(name) + "=";
    hint.is_type = false;
    hint.certainty = CertaintyOf(callee.doubt);
    hints.push_back(std::move(hint));
  }
}

std::vector<InlineHint> Workspace::Hints(FileId id, uint32_t begin, uint32_t end) {
  Impl& in = *impl_;
  in.Begin();
  std::vector<InlineHint> hints;
  const SourceFile* file = in.Get(id);
  if (file == nullptr || file->is_stub) return hints;
  const FileSyntax& syntax = file->syntax;
  const auto add_type = [&](uint32_t offset, Text lead, Value value) {
    value = in.inference.WithoutForeign(value);
    if (!value.IsKnown()) return;
    std::string text = in.TextOfSet(value.set, true);
    if (text.size() > kMostText || text == "Any" || text.find('\n') != std::string::npos) return;
    InlineHint hint;
    hint.offset = offset;
    hint.text = std::string(lead) + text;
    hint.certainty = CertaintyOf(value.doubt);
    hints.push_back(std::move(hint));
  };
  for (StmtId stmt = 1; stmt < syntax.stmts.size(); ++stmt) {
    const Stmt& at = syntax.stmt(stmt);
    if (at.begin < begin || at.begin >= end) continue;
    in.inference.BeginPart();
    if (at.kind == StmtKind::kDef && at.hint == kNoExpr && at.first_child != kModuleStmt &&
        (at.flags & kStmtIsBroken) == 0 && syntax.NameOf(at) != "__init__") {
      const FunctionId function = in.inference.FunctionOfStmt(id, stmt);
      // Behind the bracket that closes the parameters.
      uint32_t close = at.end;
      while (close > at.name_end && file->text()[close - 1] != ')') --close;
      if (function != kNoId && close > at.name_end) add_type(close, " -> ", in.inference.ResultOfFunction(function));
    } else if (at.kind == StmtKind::kAssign && at.hint == kNoExpr) {
      const auto exprs = syntax.ExprsOf(at);
      if (exprs.size() != 2 || syntax[exprs[0]].kind != ExprKind::kName || IsPlain(syntax, exprs[1])) continue;
      const Value value = in.inference.ValueOf(id, exprs[1]);
      const TypeList types = in.inference.types().CopyOf(value.set);
      const bool is_alias = std::ranges::any_of(types, [&](TypeId type) {
        const TypeKind kind = in.inference.types()[type].kind;
        return kind == TypeKind::kClass || kind == TypeKind::kModule || kind == TypeKind::kFunction ||
               kind == TypeKind::kTypeForm || kind == TypeKind::kSpecial || kind == TypeKind::kTypeVar;
      });
      if (!is_alias) add_type(syntax[exprs[0]].end, ": ", value);
    }
  }
  for (ExprId expr = 1; expr < syntax.exprs.size(); ++expr) {
    if (syntax[expr].kind != ExprKind::kCall || syntax[expr].begin < begin || syntax[expr].begin >= end) continue;
    in.inference.BeginPart();
    in.AddParameterHints(*file, expr, hints);
  }
  std::ranges::stable_sort(hints, {}, &InlineHint::offset);
  return hints;
}

}  // namespace quillet
