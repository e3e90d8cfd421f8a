// A def or class line defines a name where it stands and opens a scope, whose parameters are records
// of their own kind. A lambda has no line of its own, so its parameters are stores inside a
// sub-expression. Decorators, global and nonlocal declarations belong here too.
//
// That a name is a function or a class is not recorded: the line's kind tells it.

#include "siblings/symbolinfo/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {

void CNodeWalker::VisitFuncdef(CFuncdefStmt* node) {
  if (const Text name = node->GetFunctionName(); !IsNone(name)) AddNameDefined(name);
  if (CNode* parameters = node->GetParameters()) VisitParameters(parameters);
  if (CNode* return_type = node->GetReturnType()) VisitNode(return_type);
}

void CNodeWalker::VisitParameters(CNode* node) { ProcessDefiningArgList(GetDefiningArgInfoList(node)); }

void CNodeWalker::ProcessDefiningArgList(const ArgList& arg_list) {
  for (const ArgEntry& entry : arg_list) {
    if (entry.is_list) {
      ProcessDefiningArgList(entry.list);
      continue;
    }
    const CArgInfo& arg = entry.arg;
    // The bare star of keyword-only parameters.
    if (arg.name == nullptr) continue;
    Assert(arg.name->IsLeaf(), "the name of a parameter has no text");
    LogicalLine& logical = RequireLogical();
    const Text name = Keep(arg.name->fText());
    logical.AppendStableArgTypeEquiv(name, kSetPrefix);

    if (arg.value != nullptr) {
      if (const Text equiv = TypeEquivForNode(arg.value); !IsNone(equiv)) AddArgInfoBytes(name, equiv);
    } else if (arg.prefix == "*") {
      logical.AppendStableArgTypeEquiv(name, kTupleInstanceName);
    } else if (arg.prefix == "**") {
      logical.AppendStableArgTypeEquiv(name, kDictInstanceName);
    }
    // Defaults and annotations belong to the enclosing scope.
    if (arg.value != nullptr) VisitNode(arg.value);
    if (arg.type_expr != nullptr) VisitNode(arg.type_expr);
  }
}

void CNodeWalker::VisitLambdaExpr(CLambdaExpr* node) {
  if (CNode* arguments = node->GetArgumentsNode()) ProcessLambdaDefiningArgList(GetDefiningArgInfoList(arguments));
  VisitNode(node->GetBodyExpr());
}

void CNodeWalker::ProcessLambdaDefiningArgList(const ArgList& arg_list) {
  for (const ArgEntry& entry : arg_list) {
    if (entry.is_list) {
      ProcessLambdaDefiningArgList(entry.list);
      continue;
    }
    const CArgInfo& arg = entry.arg;
    if (arg.name != nullptr) VisitStoreContextNode(arg.name, /*within_sub_expr=*/true);
    if (arg.value != nullptr) VisitNode(arg.value);
  }
}

void CNodeWalker::VisitClassdef(CClassdefStmt* node) {
  if (const Text name = node->GetClassName(); !IsNone(name)) AddNameDefined(name);
  for (const CArgInfo& arg : node->GetBaseClassList()) VisitNode(arg.value);
}

void CNodeWalker::VisitSingleDecorator(CSingleDecorator* node) {
  // A call with the decorated object left out of the arguments.
  CNode* dotted = node->GetDottedName();
  VisitNode(dotted);
  const UsedArgList arg_list = node->GetUsedArgList();
  const Text name = fToText.TextForNode(dotted);
  ProcessFunctionCall(IsNone(name) ? kNoText : Keep(name), arg_list);
}

void CNodeWalker::VisitGlobalStmt(CGlobalStmt* node) {
  for (const Text name : node->GetUtf8NameList()) AddStableTypeEquiv(Keep(name), kGlobalPrefix);
}

void CNodeWalker::VisitNonlocalStmt(CNonlocalStmt* node) {
  for (const Text name : node->GetUtf8NameList()) AddStableTypeEquiv(Keep(name), kNonlocalPrefix);
}

}  // namespace quillet
