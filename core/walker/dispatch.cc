// Which visit a node gets: by its class alone, but for an argument of a call, which counts as a
// named expression where it assigns a name.
//
// A class without a visit of its own is walked through its children. Only VisitNode counts against
// the limits; visits that call one another directly do not.

#include "walker/walker.h"

namespace quillet {
namespace {

// Classes of leaves that VisitNode has no visit for.
bool IsWalkedThroughChildren(NodeKind kind) {
  return kind == NodeKind::kCNode || kind == NodeKind::kCKeywordLiteral || kind == NodeKind::kCNumberLiteral ||
         kind == NodeKind::kCStringLiteral;
}

}  // namespace

void CNodeWalker::ThrowTooManyVisits() {
  ThrowError(ErrorKind::kRuntimeError, "Maximum number of calls to _VisitNode exceeded");
}

void CNodeWalker::ThrowTooDeep() {
  // The visit was counted when it was found to be one too deep.
  ++fRecurseCount;
  ThrowError(ErrorKind::kRuntimeError, "Maximum recurse count in _VisitNode exceeded");
}

void CNodeWalker::VisitChildren(CNode* node) {
  if (node == nullptr) ThrowNoAttribute("fChildren");
  for (uint32_t i = 0; i < node->child_count; ++i) {
    CNode* const child = node->children[i];
    // Punctuation, keywords and literals are most of a statement, and nothing is to be done for them.
    if (child != nullptr && child->child_count == 0 && IsWalkedThroughChildren(child->kind)) {
      CountVisit();
    } else {
      VisitNode(child);
    }
  }
}

void CNodeWalker::VisitNode(CNode* node) {
  CountVisit();
  struct OneDeeper {
    int32_t& depth;
    explicit OneDeeper(int32_t& count) : depth(count) { ++depth; }
    ~OneDeeper() { --depth; }
  } one_deeper(fRecurseCount);
  if (node == nullptr) ThrowNoAttribute("fChildren");

  switch (node->kind) {
    case NodeKind::kCWithItem:
      return VisitWithItem(cast<CWithItem>(node));
    case NodeKind::kCStarExpression:
      met_doubtful_ = true;
      return VisitChildren(node);
    case NodeKind::kCDelStmt:
      if (is_complete_) DoubtTarget(node->GetChild(1));
      return VisitChildren(node);
    case NodeKind::kCImportNamesStmt:
      return VisitImportNames(cast<CImportNamesStmt>(node));
    case NodeKind::kCFromImportStmt:
      return VisitFromImport(cast<CFromImportStmt>(node));
    case NodeKind::kCExprStmt:
      return VisitExprStmt(cast<CExprStmt>(node));
    case NodeKind::kCForStmt:
      return VisitForStmt(cast<CForStmt>(node));
    case NodeKind::kCFuncdefStmt:
      return VisitFuncdef(cast<CFuncdefStmt>(node));
    case NodeKind::kCReturnStmt:
      return VisitReturn(cast<CReturnStmt>(node));
    case NodeKind::kCClassdefStmt:
      return VisitClassdef(cast<CClassdefStmt>(node));
    case NodeKind::kCLambdaExpr:
      return VisitLambdaExpr(cast<CLambdaExpr>(node));
    case NodeKind::kCGlobalStmt:
      return VisitGlobalStmt(cast<CGlobalStmt>(node));
    case NodeKind::kCNonlocalStmt:
      return VisitNonlocalStmt(cast<CNonlocalStmt>(node));
    case NodeKind::kCPower:
      return VisitPower(cast<CPower>(node));
    case NodeKind::kCAtomExpr:
      return VisitAtomExpr(cast<CAtomExpr>(node));
    case NodeKind::kCNameLiteral:
      return VisitNameLiteral(node, nullptr, {}, -1, /*has_trailers=*/false);
    case NodeKind::kCCompForNode:
      return VisitCompForNode(cast<CCompForNode>(node));
    case NodeKind::kCSingleDecorator:
      return VisitSingleDecorator(cast<CSingleDecorator>(node));
    case NodeKind::kCDottedName:
      return VisitDottedName(cast<CDottedName>(node));
    case NodeKind::kCExceptClause:
      return VisitExceptClause(cast<CExceptClause>(node));
    case NodeKind::kCYieldExpr:
      return VisitYield(cast<CYieldExpr>(node));
    case NodeKind::kCNamedExpr:
      return VisitNamedExpr(node);
    case NodeKind::kCMatchStmt:
      return VisitMatchStmt(cast<CMatchStmt>(node));
    case NodeKind::kCCaseStmt:
      return VisitCaseStmt(cast<CCaseStmt>(node));
    case NodeKind::kCSingleUsedArgumentNode:
      // f(x := 1)
      if (cast<CSingleUsedArgumentNode>(node)->GetNameAssigned() != nullptr) return VisitNamedExpr(node);
      return VisitChildren(node);
    case NodeKind::kCTypeParameter:
      return VisitTypeParameter(cast<CTypeParameter>(node));

    case NodeKind::kCNode:
    case NodeKind::kCStmt:
    case NodeKind::kCIfStmt:
    case NodeKind::kCWithStmt:
    case NodeKind::kCPassStmt:
    case NodeKind::kCWithTypeParameters:
    case NodeKind::kCExpression:
    case NodeKind::kCAtom:
    case NodeKind::kCOperatorExpression:
    case NodeKind::kCIfElseExpression:
    case NodeKind::kCTestExpr:
    case NodeKind::kCTestListStarExpr:
    case NodeKind::kCKeywordLiteral:
    case NodeKind::kCNumberLiteral:
    case NodeKind::kCStringLiteral:
    case NodeKind::kCFactorExpr:
    case NodeKind::kCPatternNode:
    case NodeKind::kCSequencePatternNode:
    case NodeKind::kCMappingPatternNode:
    case NodeKind::kCClassArgumentPatternNode:
    case NodeKind::kCClassPatternNode:
    case NodeKind::kCFunctionParameterDef:
    case NodeKind::kCDefiningArglistNode:
    case NodeKind::kCUsedArglistNode:
    case NodeKind::kCParametersNode:
    case NodeKind::kCMultipleDecorators:
    case NodeKind::kCAnnotatedAssignNode:
    case NodeKind::kCBinaryOp:
    case NodeKind::kCYieldArg:
    case NodeKind::kCListmakerNode:
    case NodeKind::kCTrailer:
      return VisitChildren(node);
  }
}

}  // namespace quillet
