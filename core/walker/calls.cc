// What a call tells of its callee, isinstance of a name, and return and yield of the function.
//
// A call is recorded where the callee is a dotted name and all arguments are positional and have a
// text. Results go under the names "return" and "yield", which no identifier can be. The trap is the
// order: all arguments are walked before the record is made, and a generator expression that needs
// parentheses ends the walk in the middle of them.

#include "lines/syntax_error.h"
#include "vocabulary/symbolinfo.h"
#include "walker/class_texts.h"
#include "walker/walker.h"

namespace quillet {

void CNodeWalker::VisitCall(CNode* atom, std::span<CNode* const> prev_trailers, CNode* arglist) {
  const Text name = fToText.TextForAtomPlusTrailers(atom, prev_trailers, {.dotted_name_only = true});
  ProcessCallOf(IsNone(name) ? kNoText : Keep(name), arglist);
}

void CNodeWalker::ProcessCallOf(Text func_name, CNode* arglist) {
  const ListStack<UsedArgList>::Lease list(used_lists_);
  GetUsedArgInfoList(arglist, *list);
  DoubtComma(arglist, *list);
  ProcessFunctionCall(func_name, *list);
}

void CNodeWalker::ProcessFunctionCall(Text func_name, const UsedArgList& arg_list) {
  if (is_complete_) DoubtArguments(arg_list);
  for (const CArgInfo& arg : arg_list) {
    if (arg_list.size() > 1) {
      if (auto* argument = dyn_cast<CSingleUsedArgumentNode>(arg.value)) {
        if (argument->IsUnparenthesizedGenExpr()) {
          throw CreateSyntaxError("Generator expression must be parenthesized if not sole argument", RequireLogical(),
                                  argument->fContext);
        }
      }
    }
    VisitNode(arg.value);
  }
  if (func_name == "isinstance") ProcessIsInstanceCall(arg_list);
  if (IsNone(func_name)) return;

  scratch_.assign(kCalledPrefix).append("(");
  for (size_t i = 0; i < arg_list.size(); ++i) {
    const CArgInfo& arg = arg_list[i];
    if (arg.value == nullptr || arg.name != nullptr || !IsNone(arg.prefix)) return;
    const Text text = fToText.TextForNode(arg.value);
    if (IsNone(text)) return;
    if (i > 0) scratch_.append(",");
    scratch_.append(text);
  }
  scratch_.append(")");
  AddTypeEquiv(func_name, scratch_);
}

void CNodeWalker::ProcessIsInstanceCall(const UsedArgList& arg_list) {
  if (arg_list.size() != 2) return;
  for (const CArgInfo& arg : arg_list) {
    if (arg.name != nullptr || !IsNone(arg.prefix)) return;
  }
  const Text text = fToText.TextForNode(arg_list[0].value, {.dotted_name_only = true});
  if (IsNone(text)) return;
  const Text target = Keep(text);
  // Wherever the call stands: the walker sees one statement and knows of no branch.
  ForEachClassText(arg_list[1].value, [&](Text cls) { AddStableTypeEquiv(target, Keep(InstanceNameForClass(cls))); });
}

void CNodeWalker::VisitReturn(CReturnStmt* node) {
  CNode* const value = node->GetValue();
  if (value == nullptr) return;
  VisitNode(value);
  if (const Text equiv = TypeEquivForNode(value); !IsNone(equiv)) AddStableTypeEquiv("return", Keep(equiv));
}

void CNodeWalker::VisitYield(CYieldExpr* node) {
  CNode* const value = node->GetValue();
  if (value == nullptr) return;
  VisitNode(value);
  Text equiv = TypeEquivForNode(value);
  // Also a value of which nothing is known makes a function a generator.
  if (IsNone(equiv)) equiv = "";
  if (node->IsYieldFrom()) equiv = scratch_.assign("from ").append(equiv);
  AddStableTypeEquiv("yield", Keep(equiv));
}

}  // namespace quillet
