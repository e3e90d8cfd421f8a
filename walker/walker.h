// CNodeWalker turns one statement's tree into records on its logical line: which names it defines,
// reads, calls and imports, and what it says of their types.
//
// One entry, Walk; one dispatch, VisitNode (dispatch.cc), a table to be read whole; a file for each
// family of statements. Records reach the line through four recorders only. They appear in this
// order: what the visits record directly, in the order of the walk; then all reads; then all stores
// inside sub-expressions. Two limits bound the work, 10000 visits and a depth of 40; reaching one
// prints a line and drops the reads, and is no error to the caller.
//
// The walker is reused for walk after walk and holds nothing in between but its options.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "siblings/logicalline/logical_line.h"
#include "text/node_to_text.h"
#include "tree/nodes.h"
#include "walker/name_set.h"

namespace quillet {

class CNodeWalker {
 public:
  explicit CNodeWalker(Version version);

  // Null `node`: nothing happens. SyntaxError for code that parses but is not valid.
  void Walk(CNode* node, LogicalLine* logical);

  // ---- frame (walker.cc, dispatch.cc) ----
  void ProcessNamesFound(CNode* node);
  void VisitChildren(CNode* node);
  void VisitNode(CNode* node);

  // ---- names (names.cc) ----
  void VisitStoreContextNode(CNode* node, bool within_sub_expr = false);
  void VisitLoadContextNode(CNode* node);
  void VisitCompForNode(CCompForNode* node);
  void VisitNameLiteral(CNode* node, CNode* atom_node, std::span<CNode* const> all_trailers, int64_t trailer_i,
                        bool has_trailers);
  void VisitDottedName(CDottedName* node);
  void ProcessLoadName(Text name);
  void VisitPower(CPower* node);
  void VisitAtomExpr(CAtomExpr* node);
  void VisitAtomPlusTrailers(CNode* atom_node, std::span<CNode* const> all_trailers);

  // ---- imports (imports.cc) ----
  void VisitImportNames(CImportNamesStmt* node);
  void VisitFromImport(CFromImportStmt* node);

  // ---- definitions (definitions.cc) ----
  void VisitFuncdef(CFuncdefStmt* node);
  void VisitParameters(CNode* node);
  void ProcessDefiningArgList(const ArgList& arg_list);
  void VisitLambdaExpr(CLambdaExpr* node);
  void ProcessLambdaDefiningArgList(const ArgList& arg_list);
  void VisitClassdef(CClassdefStmt* node);
  void VisitSingleDecorator(CSingleDecorator* node);
  void VisitGlobalStmt(CGlobalStmt* node);
  void VisitNonlocalStmt(CNonlocalStmt* node);

  // ---- assignments (assignments.cc) ----
  void VisitExprStmt(CExprStmt* node);
  void VisitAssignment(CExprStmt* node);
  void VisitAugAssign(CExprStmt* node);
  void VisitAnnotatedAssign(CExprStmt* node);
  // `extra_trailer` none, or the subscripts to apply to the value.
  void ProcessTargets(CNode* lhs, CNode* rhs, Text extra_trailer = kNoText);
  void VisitForStmt(CForStmt* node);
  void VisitWithItem(CWithItem* node);
  void VisitExceptClause(CExceptClause* node);
  void VisitNamedExpr(CNode* node);

  // ---- calls, returns, yields (calls.cc) ----
  void VisitCall(CNode* atom, std::span<CNode* const> prev_trailers, CNode* arglist);
  void ProcessFunctionCall(Text func_name, const UsedArgList& arg_list);
  void ProcessIsInstanceCall(const UsedArgList& arg_list);
  void VisitReturn(CReturnStmt* node);
  void VisitYield(CYieldExpr* node);

  // ---- equivalents (equivs.cc) ----
  // None where nothing is known. The text is static, a view of the source, or stands in the
  // walker's buffer until its next call.
  Text TypeEquivForNode(CNode* node, Text extra_trailer = kNoText);
  Text TypeEquivForOperatorExpression(CNode* node);
  void AppendEquivNode(CNode* name_node, CNode* equiv_node, Text extra_trailer = kNoText);
  void AppendSubscriptedEquivNode(CNode* name_node, CNode* equiv_node, int64_t subscript);
  void AddNodeInfoStr(CNode* name_node, Text istr);

  // ---- patterns and type parameters (patterns.cc) ----
  void VisitMatchStmt(CMatchStmt* node);
  void VisitCaseStmt(CCaseStmt* node);
  void VisitPatternNode(CNode* node);
  void VisitTypeParameter(CTypeParameter* node);

  // ---- recorders (walker.cc) ----
  void AddTypeEquiv(Text name, Text equiv);
  void AddArgInfoBytes(Text name, Text info);
  void AddNameDefined(Text name);
  void AddArgNameDefined(Text name);

  // ---- options and state, readable by hosts ----
  bool fIncludeExprText = true;
  bool fIncludeOperatorExpressions = true;
  int64_t fMaxOperatorExpressionLength = 120;  // kept for hosts; the bound applied is a constant
  bool fPy3;
  int32_t fMaxVisits = 10000;
  int32_t fMaxRecurseCount = 40;
  CNodeToTextConverter fToText;
  LogicalLine* fLogical = nullptr;
  bool fLoadNameContext = true;
  bool fStoreWithinSubExpr = false;
  int32_t fVisitCount = 0;
  int32_t fRecurseCount = 0;
  NameSet fLoadedNames;
  StoreList fStoredNames;

 private:
  std::string equiv_buffer_;
  std::string name_buffer_;
};

}  // namespace quillet
