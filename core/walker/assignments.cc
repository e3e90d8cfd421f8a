// Every construct that binds a value to a target ends in ProcessTargets, which lays the shape of the
// target over the shape of the value and so pairs each name with an expression, or with the value
// and the subscripts that pick its part: a, b = f() gives a the equivalent f()[0].
//
// The pairing is by position and by syntax alone. Two traps, both meant: a name in parentheses,
// (a) = 1, has no sub-expressions and so binds nothing; and what stands in several brackets counts
// as its contents, as CAtom::GetSubExprCount has it.

#include <charconv>

#include "lines/syntax_error.h"
#include "vocabulary/symbolinfo.h"
#include "walker/class_texts.h"
#include "walker/walker.h"

namespace quillet {
namespace {

// What takes part in unpacking, on either side.
bool IsSequence(const CNode* node) { return isa<CTestListStarExpr>(node) || isa<CAtom>(node); }

void AppendSubscript(int32_t index, std::string& trailer) {
  char digits[12];
  const char* end = std::to_chars(digits, digits + sizeof digits, index).ptr;
  trailer.append("[").append(Text(digits, static_cast<size_t>(end - digits))).append("]");
}

}  // namespace

// ---- expression statements ----

void CNodeWalker::VisitExprStmt(CExprStmt* node) {
  if (node->GetAnnotatedAssignNode() != nullptr) return VisitAnnotatedAssign(node);
  if (node->GetEqualCount() != 0) return VisitAssignment(node);
  if (!IsNone(node->GetAugAssignOp())) return VisitAugAssign(node);
  VisitChildren(node);
}

void CNodeWalker::VisitAssignment(CExprStmt* node) {
  const int64_t equal_count = node->GetEqualCount();
  if (equal_count == 0) return VisitChildren(node);
  CNode* const value = node->GetPostEqualsTestExpr(equal_count - 1);
  for (int64_t i = -1; i < equal_count - 1; ++i) {
    CNode* const target = i < 0 ? node->GetInitialTestExpr() : node->GetPostEqualsTestExpr(i);
    if (is_complete_) DoubtTarget(target);
    ProcessTargets(target, value);
    // Reads the names inside the target that it does not bind.
    VisitStoreContextNode(target);
  }
  VisitNode(value);
}

void CNodeWalker::VisitAugAssign(CExprStmt* node) {
  // It changes a binding and makes none: x += 1 only reads x. That is meant.
  if (is_complete_) {
    const CNode* const target = node->GetInitialTestExpr();
    DoubtTarget(target);
    met_doubtful_ |= isa<CTestListStarExpr>(target) || isa<CAtom>(target);
  }
  VisitChildren(node);
}

void CNodeWalker::VisitAnnotatedAssign(CExprStmt* node) {
  CNode* const target = node->GetInitialTestExpr();
  if (is_complete_) {
    DoubtTarget(target);
    // A list of targets takes no annotation, which a single one does in any brackets, but not with some in front.
    met_doubtful_ |= isa<CTestListStarExpr>(target) || isa<CAtom>(target) || RequireLogical().toks[0].code == tok::LPAR;
  }
  VisitStoreContextNode(target);
  CAnnotatedAssignNode* const annotation = node->GetAnnotatedAssignNode();
  if (annotation == nullptr) return;
  // The hint and the value.
  VisitNode(annotation);
  // Without a value nothing is defined.
  if (CNode* value = annotation->GetPostEqualsTestExpr()) ProcessTargets(target, value);
}

// ---- targets ----

void CNodeWalker::ProcessTargets(CNode* lhs, CNode* rhs, Text extra_trailer) {
  lhs = TargetIn(lhs);
  if (!IsSequence(lhs)) return AppendEquivNode(lhs, rhs, extra_trailer);
  std::string trailer(extra_trailer);
  ProcessTargetsAtDepth(lhs, rhs, !IsNone(extra_trailer), trailer, 0);
}

// `trailer` grows and shrinks with the nesting of the targets.
void CNodeWalker::ProcessTargetsAtDepth(CNode* lhs, CNode* rhs, bool has_trailer, std::string& trailer, int depth) {
  lhs = TargetIn(lhs);
  if (!IsSequence(lhs)) return AppendEquivNode(lhs, rhs, has_trailer ? Text(trailer) : kNoText);
  if (depth >= kMaxTargetDepth) {
    ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded while unpacking a target");
  }
  const SubExprView targets = cast<CExpression>(lhs)->GetSubExprView();
  const SubExprView values = !has_trailer && IsSequence(rhs) ? cast<CExpression>(rhs)->GetSubExprView() : SubExprView();
  const size_t trailer_size = trailer.size();
  for (int32_t i = 0; i < targets.count; ++i) {
    CNode* const value = i < values.count ? values.At(i) : nullptr;
    CNode* const target = targets.At(i);
    if (auto* starred = dyn_cast<CStarExpression>(target)) {
      ProcessStarredTarget(starred, depth);
    } else if (value != nullptr) {
      ProcessTargetsAtDepth(target, value, /*has_trailer=*/false, trailer, depth + 1);
    } else {
      // The value as a whole, and which part of it is meant.
      AppendSubscript(i, trailer);
      ProcessTargetsAtDepth(target, rhs, /*has_trailer=*/true, trailer, depth + 1);
      trailer.resize(trailer_size);
    }
  }
}

void CNodeWalker::ProcessStarredTarget(CStarExpression* target, int depth) {
  if (CNode* starred = TargetIn(target->GetStarredExpression()); is_complete_ && IsSequence(starred)) {
    // Its names are bound to elements of a list that is not known.
    std::string trailer;
    return ProcessTargetsAtDepth(starred, nullptr, /*has_trailer=*/false, trailer, depth + 1);
  }
  // A list, whatever the value is.
  const Text text = fToText.TextForNode(target->GetStarredExpression());
  if (IsNone(text)) return;
  const Text name = Keep(text);
  AddKeptNameDefined(name);
  AddStableTypeEquiv(name, kListInstanceName);
}

// ---- statements that bind ----

void CNodeWalker::VisitForStmt(CForStmt* node) {
  CNode* const target = node->GetTarget();
  CNode* const iterable = node->GetInExpression();
  if (is_complete_) DoubtTarget(target);
  VisitStoreContextNode(target, /*within_sub_expr=*/false);
  VisitNode(iterable);
  ProcessTargets(target, iterable, kIterationSubscript);
  VisitNode(node->GetBody());
  if (CNode* else_body = node->GetElseBody()) VisitNode(else_body);
}

void CNodeWalker::VisitWithItem(CWithItem* node) {
  // The target is not walked, so names inside a subscript of it are not read; that is meant. Nor is
  // it worked out what entering the context gives.
  CNode* const expression = node->GetExpression();
  ProcessTargets(node->GetTarget(), expression);
  if (is_complete_) {
    DoubtTarget(node->GetTarget());
    VisitStoreContextNode(node->GetTarget());
  }
  VisitNode(expression);
}

void CNodeWalker::VisitExceptClause(CExceptClause* node) {
  CNode* const target = node->GetTarget();
  CNode* const type_expr = node->GetExceptionType();
  if (type_expr == nullptr) return;
  VisitNode(type_expr);
  if (target == nullptr) return;
  if (is_complete_ && !isa<CNameLiteral>(target)) {
    DoubtTarget(target);
    ProcessTargets(target, nullptr);
    return VisitStoreContextNode(target);
  }
  if (!isa<CNameLiteral>(target)) {
    // except E, (a, b): of the older language.
    throw CreateSyntaxError("Name in except clause must be a simple name", RequireLogical(), target->fContext);
  }
  ProcessTargets(target, nullptr);
  ForEachClassText(type_expr, [&](Text cls) { AddNodeInfoStr(target, InstanceNameForClass(cls)); });
}

void CNodeWalker::VisitNamedExpr(CNode* node) {
  met_doubtful_ = true;
  CNode* name_node = nullptr;
  CNode* value = nullptr;
  if (auto* named = dyn_cast<CNamedExpr>(node)) {
    name_node = named->GetAssignedName();
    value = named->GetRightHandExpression();
  } else {
    auto* argument = dyn_cast<CSingleUsedArgumentNode>(node);
    Assert(argument != nullptr, "a named expression of another class");
    name_node = argument->GetNameAssigned();
    value = argument->GetNamedRightHandExpression();
  }
  ProcessTargets(name_node, value);
  VisitNode(value);
}

}  // namespace quillet
