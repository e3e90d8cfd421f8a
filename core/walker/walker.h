// CNodeWalker turns one statement's tree into records on its logical line: which names it defines,
// reads, calls and imports, and what it says of their types.
//
// One entry, Walk; one dispatch, VisitNode (dispatch.cc), a table to be read whole; a file for each
// family of statements. Records reach the line through the recorders below, which take any text, or
// through their short form for texts that are kept already. They appear in this order: what the visits record directly,
// in the order of the walk; then all reads; then all stores inside sub-expressions. Two limits bound the work, 10000
// visits and a depth of 40; reaching one prints a line and drops the reads, and is no error to the caller.
//
// Texts on the way to a record are views of the source where they can be. Keep decides: a view of
// the line's own source stays, anything else is copied to where the line's records live.
//
// The walker is reused for walk after walk and holds nothing in between but its options.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "foundations/arena.h"
#include "foundations/thread_use.h"
#include "lines/logical_line.h"
#include "text/node_to_text.h"
#include "tree/arg_info.h"
#include "tree/nodes.h"
#include "vocabulary/symbolinfo.h"
#include "walker/list_stack.h"
#include "walker/name_set.h"

namespace quillet {

class CNodeWalker {
 public:
  // A target nested deeper in brackets than this is a RecursionError.
  static constexpr int kMaxTargetDepth = 400;
  // The same for a pattern; that of the pattern parser is smaller.
  static constexpr int kMaxPatternDepth = 400;
  // Records of one statement may take this much memory for text that is no view of the source, and
  // kComposedPerSourceByte times its source beside that. Only statements made to do harm come near
  // it: ten thousand names unpacked from a value of a megabyte would take ten gigabytes. More is a
  // RuntimeError.
  static constexpr size_t kMaxComposedSize = size_t{64} << 20;
  static constexpr size_t kComposedPerSourceByte = 8;
  // In bytes; a longer operator expression is not worth its place on the line.
  static constexpr size_t kMaxOperatorText = 120;

  explicit CNodeWalker(Version version);

  // Null `node`: nothing happens. SyntaxError for code that parses but is not valid. ValueError while
  // a walk is running.
  void Walk(CNode* node, LogicalLine* logical);

  // ---- complete readings ----
  // For hosts that want all that a statement says, where the walk is otherwise bound to what its first hosts
  // know: powers keep their exponents, a target in brackets is bound, what a target reads is read, and no
  // limit that a source meets ends the walk.
  void ReadCompletely();
  // Whether the last walk met what the tables take and the language may not: a target that is none, an
  // argument out of order, a star, an assignment in an expression.
  bool met_doubtful() const { return met_doubtful_; }
  void set_met_doubtful(bool met) { met_doubtful_ = met; }
  // Whether the last walk held the text of an operator expression against the limit.
  bool met_operator_text() const { return met_operator_text_; }

  // ---- the line, as a host hands it in ----
  // For operations by name between walks, or to send what follows in a walk to another line. Nobody
  // knows how long such a line lives, nor what it does with its records meanwhile, so from here to the
  // end of the next walk records are copied to it and names that were collected stay with the walker.
  void SetLogical(LogicalLine* logical);
  // While one lives, an operation that the host called by name is at work: no walk may begin, since
  // its end lets go of the texts that the operation has in hand.
  class Operation {
   public:
    explicit Operation(CNodeWalker& walker) : walker_(walker) { ++walker_.operations_; }
    ~Operation() { --walker_.operations_; }
    Operation(const Operation&) = delete;
    Operation& operator=(const Operation&) = delete;

   private:
    CNodeWalker& walker_;
  };

  // ---- frame (walker.cc, dispatch.cc) ----
  void ProcessNamesFound(CNode* node);
  void VisitChildren(CNode* node);
  void VisitNode(CNode* node);
  // ValueError unless the node is of the class or of one derived from it.
  void RaiseIfNotInstance(const CNode* node, NodeKind cls) const;

  // ---- names (names.cc) ----
  void VisitStoreContextNode(CNode* node, bool within_sub_expr = false);
  void VisitLoadContextNode(CNode* node);
  void VisitCompForNode(CCompForNode* node);
  // One name, alone (`has_trailers` false) or as the link of a chain behind `trailer_i` trailers.
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
  // `extra_trailer` none, or the subscripts to apply to the value. A null `rhs` is an unknown value.
  void ProcessTargets(CNode* lhs, CNode* rhs, Text extra_trailer = kNoText);
  void VisitForStmt(CForStmt* node);
  void VisitWithItem(CWithItem* node);
  void VisitExceptClause(CExceptClause* node);
  // AssertionError for a node that is neither a CNamedExpr nor a CSingleUsedArgumentNode.
  void VisitNamedExpr(CNode* node);

  // ---- calls, returns, yields (calls.cc) ----
  void VisitCall(CNode* atom, std::span<CNode* const> prev_trailers, CNode* arglist);
  // `func_name` none: the callee is no dotted name.
  void ProcessFunctionCall(Text func_name, const UsedArgList& arg_list);
  void ProcessIsInstanceCall(const UsedArgList& arg_list);
  void VisitReturn(CReturnStmt* node);
  void VisitYield(CYieldExpr* node);

  // ---- equivalents (equivs.cc) ----
  // None where nothing is known. The text is a view, or stands in a buffer of the walker or of
  // fToText until the next call of either.
  Text TypeEquivForNode(CNode* node, Text extra_trailer = kNoText);
  Text TypeEquivForOperatorExpression(COperatorExpression* node);
  void AppendEquivNode(CNode* name_node, CNode* equiv_node, Text extra_trailer = kNoText);
  void AppendSubscriptedEquivNode(CNode* name_node, CNode* equiv_node, int64_t subscript);
  void AddNodeInfoStr(CNode* name_node, Text istr);

  // ---- patterns and type parameters (patterns.cc) ----
  void VisitMatchStmt(CMatchStmt* node);
  void VisitCaseStmt(CCaseStmt* node);
  void VisitPatternNode(CNode* node);
  void VisitTypeParameter(CTypeParameter* node);

  // ---- recorders (walker.cc) ----
  // Any texts. AttributeError outside of a walk.
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
  // For a host whose threads take turns: who is in the middle of an operation.
  ThreadUse thread_use;

 private:
  // Counts one call of VisitNode and checks both limits for it.
  void CountVisit() {
    if (++fVisitCount > fMaxVisits) [[unlikely]]
      ThrowTooManyVisits();
    if (fRecurseCount >= fMaxRecurseCount) [[unlikely]]
      ThrowTooDeep();
  }
  [[noreturn]] void ThrowTooManyVisits();
  [[noreturn]] void ThrowTooDeep();
  void EndWalk();
  LogicalLine& RequireLogical() const {
    if (fLogical == nullptr) [[unlikely]]
      ThrowNoAttribute("AppendTypeEquiv");
    return *fLogical;
  }

  // ---- texts that records refer to ----
  bool InSource(Text text) const {
    // Counted from the start, an address in front of it is a huge number. Without a source there is
    // no text that may stay.
    return source_begin_ != 0 && reinterpret_cast<uintptr_t>(text.data()) - source_begin_ <= source_size_;
  }
  // The text itself where it is a view of the line's source; else a copy that lasts as long as the
  // line's records.
  Text Keep(Text text) { return InSource(text) ? text : KeepCopy(text); }
  Text KeepCopy(Text text);
  // Where such copies go: to the line, or, where a host's hooks take the records, to the walker.
  TextArena& Texts() {
    if (direct_ != nullptr && direct_->hooks == nullptr) [[likely]]
      return direct_->texts();
    own_texts_used_ = true;
    return own_texts_;
  }
  void CountComposed(size_t size) {
    composed_size_ += size;
    if (composed_size_ > kMaxComposedSize + kComposedPerSourceByte * source_size_) [[unlikely]]
      ThrowTooMuchText();
  }
  [[noreturn]] void ThrowTooMuchText();
  // For texts that Keep gave, or that are static.
  void AddStableTypeEquiv(Text name, Text equiv) {
    if (direct_ == nullptr) [[unlikely]]
      return CopyTypeEquiv(name, equiv);
    direct_->AppendStableTypeEquiv(name, equiv);
  }
  void AddStableArgInfo(Text name, Text info) {
    if (direct_ == nullptr) [[unlikely]]
      return CopyArgInfo(name, info);
    direct_->AppendStableArgTypeEquiv(name, info);
  }
  // To a line that the host handed in.
  void CopyTypeEquiv(Text name, Text equiv);
  void CopyArgInfo(Text name, Text info);
  // Records that the kept name is defined.
  void AddKeptNameDefined(Text name) { AddStableTypeEquiv(name, kSetPrefix); }

  // ---- names ----
  // Whether the leaf is a name and none of the three constants.
  static bool IsName(const CNode* node) {
    // The three words are no names, in either language.
    return node->IsLeaf() && node->code != word::kNone && node->code != word::kTrue && node->code != word::kFalse;
  }
  // A name met in the current context. `more`: another link of a chain follows. `lasting`: the text
  // is one that Keep gave. The text of a read comes back as it is kept; `previous` is that of the
  // chain's link in front.
  Text ProcessName(const CNode* node, Text text, bool more, bool lasting, Text previous = kNoText);
  Text AddLoadedName(Text name, bool lasting, Text previous);
  void AddStoredName(const CNode* node, Text text, bool lasting);
  class Chain;
  void VisitTrailers(CNode* atom_node, std::span<CNode* const> all_trailers, size_t start, Text view);

  // ---- imports ----
  Text ImportedName(CNode* module);
  void AddImportAsName(Text name);

  // ---- definitions ----
  void ProcessDefiningArg(const CArgInfo& arg);
  void ProcessLambdaDefiningArg(const CArgInfo& arg);

  // ---- assignments ----
  void ProcessTargetsAtDepth(CNode* lhs, CNode* rhs, bool has_trailer, std::string& trailer, int depth);
  void ProcessStarredTarget(CStarExpression* target, int depth);

  // ---- calls ----
  void ProcessCallOf(Text func_name, CNode* arglist);
  // The texts of the classes in the second argument of isinstance or behind `except`: one dotted
  // name or those of a tuple.
  template <class Function>
  void ForEachClassText(CNode* node, Function&& function);
  // The info text of an instance, valid until the next use of scratch_.
  Text InstanceNameForClass(Text cls_name);

  // ---- equivalents ----
  Text EquivForAtom(CAtom* atom, Text extra_trailer);
  Text EquivForPower(CPower* power, Text extra_trailer);
  Text EquivForOperatorText(Text text, Text extra_trailer);
  Text LiteralInfo(Text cls_name, Text literal);
  Text StringInstanceName(const CStringLiteral* node) const;
  Text WithTrailer(Text text, Text extra_trailer);

  void VisitPatternAtDepth(CNode* node, int depth);
  void VisitWholeTypeParameter(CTypeParameter* node);

  // ---- complete readings (complete.cc) ----
  void DoubtTarget(const CNode* target);
  void DoubtArguments(const UsedArgList& arg_list) {
    for (const CArgInfo& arg : arg_list)
      if (arg.name != nullptr || !IsNone(arg.prefix)) return DoubtNamedArguments(arg_list);
  }
  // A generator expression alone, and a comma behind it.
  void DoubtComma(const CNode* arglist, const UsedArgList& arg_list) {
    if (arg_list.size() == 1 && isa<CUsedArglistNode>(arglist))
      met_doubtful_ |= isa<CSingleUsedArgumentNode>(arg_list[0].value);
  }
  // One that may be the condition of a comprehension.
  void DoubtLambda(const CNode* node);
  // Of a comprehension, by its clause.
  void DoubtElement(const CNode* clause);
  void DoubtNamedArguments(const UsedArgList& arg_list);
  void DoubtParameters(const ArgList& arg_list);
  // What stands in brackets that only group it.
  CNode* TargetIn(CNode* node) const { return is_complete_ ? DropSimpleParens(node) : node; }

  bool is_complete_ = false;
  int32_t depth_of_trailers_ = 0;  // what a chain counts for besides its visit, whose stack is several times as large
  bool met_doubtful_ = false;
  bool met_operator_text_ = false;
  LogicalLine* direct_ = nullptr;  // fLogical during a walk, unless the host set that: takes texts uncopied
  int32_t operations_ = 0;         // walks and operations by name that are under way
  uintptr_t source_begin_ = 0;     // address of the line's source, during a walk
  size_t source_size_ = 0;
  size_t composed_size_ = 0;
  TextArena own_texts_;
  bool own_texts_used_ = false;

  std::string equiv_buffer_;  // what TypeEquivForNode composes
  std::string scratch_;       // an info text on its way to its record
  std::string name_buffer_;   // the name of an import
  std::string from_buffer_;   // the front of the infos of a from-import
  ListStack<UsedArgList> used_lists_;
  ListStack<ArgList> defining_lists_;
};

}  // namespace quillet
