// A def or class line defines a name where it stands and opens a scope, whose parameters are records
// of their own kind. A lambda has no line of its own, so its parameters are stores inside a
// sub-expression. Decorators, global and nonlocal declarations belong here too.
//
// That a name is a function or a class is not recorded: the line's kind tells it.

#include <vector>

#include "vocabulary/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {
namespace {

// Calls `fn(CArgInfo)` for each parameter in order, those of nested lists in their place. Tuple
// parameters nest as deep as the source likes.
template <class Function>
void ForEachArg(const ArgList& arg_list, Function&& fn) {
  struct Level {
    const ArgList* list;
    size_t next;
  };
  std::vector<Level> around;
  Level level{&arg_list, 0};
  while (true) {
    if (level.next == level.list->size()) {
      if (around.empty()) return;
      level = around.back();
      around.pop_back();
      continue;
    }
    const ArgEntry& entry = (*level.list)[level.next++];
    if (entry.is_list) {
      around.push_back(level);
      level = {&entry.list, 0};
    } else {
      fn(entry.arg);
    }
  }
}

}  // namespace

void CNodeWalker::VisitFuncdef(CFuncdefStmt* node) {
  if (const Text name = node->GetFunctionName(); !IsNone(name)) AddNameDefined(name);
  if (CNode* parameters = node->GetParameters()) VisitParameters(parameters);
  if (CNode* return_type = node->GetReturnType()) VisitNode(return_type);
}

void CNodeWalker::VisitParameters(CNode* node) {
  const ListStack<ArgList>::Lease list(defining_lists_);
  GetDefiningArgInfoList(node, *list);
  ProcessDefiningArgList(*list);
}

void CNodeWalker::ProcessDefiningArgList(const ArgList& arg_list) {
  if (is_complete_) DoubtParameters(arg_list);
  ForEachArg(arg_list, [this](const CArgInfo& arg) { ProcessDefiningArg(arg); });
}

void CNodeWalker::ProcessDefiningArg(const CArgInfo& arg) {
  // The bare star of keyword-only parameters.
  if (arg.name == nullptr) return;
  Assert(arg.name->IsLeaf(), "the name of a parameter has no text");
  const Text name = Keep(arg.name->fText());
  AddStableArgInfo(name, kSetPrefix);

  if (arg.value != nullptr) {
    if (const Text equiv = TypeEquivForNode(arg.value); !IsNone(equiv)) {
      AddStableArgInfo(name, Keep(equiv));
    }
  } else if (arg.prefix == "*") {
    AddStableArgInfo(name, kTupleInstanceName);
  } else if (arg.prefix == "**") {
    AddStableArgInfo(name, kDictInstanceName);
  }
  // Defaults and annotations belong to the enclosing scope.
  if (arg.value != nullptr) VisitNode(arg.value);
  if (arg.type_expr != nullptr) VisitNode(arg.type_expr);
}

void CNodeWalker::VisitLambdaExpr(CLambdaExpr* node) {
  if (is_complete_) DoubtLambda(node);
  if (CNode* arguments = node->GetArgumentsNode()) {
    const ListStack<ArgList>::Lease list(defining_lists_);
    GetDefiningArgInfoList(arguments, *list);
    ProcessLambdaDefiningArgList(*list);
  }
  VisitNode(node->GetBodyExpr());
}

void CNodeWalker::ProcessLambdaDefiningArgList(const ArgList& arg_list) {
  if (is_complete_) DoubtParameters(arg_list);
  ForEachArg(arg_list, [this](const CArgInfo& arg) { ProcessLambdaDefiningArg(arg); });
}

void CNodeWalker::ProcessLambdaDefiningArg(const CArgInfo& arg) {
  if (arg.name != nullptr) VisitStoreContextNode(arg.name, /*within_sub_expr=*/true);
  if (arg.value != nullptr) VisitNode(arg.value);
}

void CNodeWalker::VisitClassdef(CClassdefStmt* node) {
  if (const Text name = node->GetClassName(); !IsNone(name)) AddNameDefined(name);
  if (CNode* bases = node->GetBaseClassesNode()) {
    const ListStack<UsedArgList>::Lease list(used_lists_);
    GetUsedArgInfoList(bases, *list);
    if (is_complete_) DoubtArguments(*list);
    for (const CArgInfo& arg : *list) {
      // It may be no list of bases.
      met_doubtful_ |= isa<CSingleUsedArgumentNode>(arg.value);
      VisitNode(arg.value);
    }
  }
}

void CNodeWalker::VisitSingleDecorator(CSingleDecorator* node) {
  // A call with the decorated object left out of the arguments.
  CNode* dotted = node->GetDottedName();
  VisitNode(dotted);
  const ListStack<UsedArgList>::Lease list(used_lists_);
  (*list).clear();
  if (CNode* args = node->GetUsedArgsNode()) {
    GetUsedArgInfoList(args, *list);
    DoubtComma(args, *list);
  }
  const Text name = fToText.TextForNode(dotted);
  ProcessFunctionCall(IsNone(name) ? kNoText : Keep(name), *list);
}

void CNodeWalker::VisitGlobalStmt(CGlobalStmt* node) {
  for (const Text name : node->GetUtf8NameList()) AddStableTypeEquiv(Keep(name), kGlobalPrefix);
}

void CNodeWalker::VisitNonlocalStmt(CNonlocalStmt* node) {
  for (const Text name : node->GetUtf8NameList()) AddStableTypeEquiv(Keep(name), kNonlocalPrefix);
}

}  // namespace quillet
