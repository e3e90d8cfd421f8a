// The node classes and their accessors.
//
// An accessor reads fixed places in a node's children and so hides the layout from the walkers.
// The two grammars differ, and a rule that matched one child is no node: whatever stands in a place
// may be a leaf or a lower rule's node, and an accessor tells by the class. Layouts (a leaf is
// written as its text, [] is optional):
//
//   CClassdefStmt        class name [( [arglist] )] : suite
//   CFuncdefStmt         def name parameters [-> test] : suite
//   CIfStmt              if test : suite ...
//   CMatchStmt           match subject :
//   CCaseStmt            case pattern [guard] : [body]
//   CDelStmt             del targets
//   CSingleDecorator     @ dotted_name [( [arglist] )] NEWLINE
//   CGlobalStmt, CNonlocalStmt   keyword name , name ...
//   CForStmt             for target in iterable : suite ...
//   CWithStmt            with item , item ... : suite
//   CWithItem            expression as target
//   CExceptClause        except [type [as|, target]]
//   CExprStmt            expr = expr ... | expr op expr | expr annassign
//   CAnnotatedAssignNode : type [= value]
//   CReturnStmt          return value
//   CTypeParameter       [prefix] name [: bound]
//   CWithTypeParameters  CTypeParameter ... statement
//   COperatorExpression  term op term op term ... | not term
//   CStarExpression      * expression
//   CTestListStarExpr    expr , expr ... [,] | expr comp_for
//   CListmakerNode       expr , expr ... [,] | expr list_for
//   CCompForNode         [async] for target in iterable [iter] | async comp_for
//   CTrailer             . name | ( [inner] ) | [ inner ]
//   CAtomExpr            [await] atom trailer ...
//   CPower               atom trailer ... [** factor] | atom_expr ** factor
//   CFactorExpr          op factor
//   CNamedExpr           test := test
//   CYieldExpr           yield value|yield_arg
//   CYieldArg            from test | one child
//   CLambdaExpr          lambda [arguments] : body
//   CAtom                ( [inner] ) | [ [inner] ] | { [inner] } | ` testlist ` | string string ...
//   CFunctionParameterDef    name : type | ( fplist )
//   CSingleUsedArgumentNode  name = value | test := test | test comp_for | * test | ** test
//   CImportNamesStmt     import names
//   CFromImportStmt      from dots/name import *|( names )|names
//
// Accessors of a fixed child throw IndexError where it is missing and TypeError where the node has
// no children; those said to be optional give null.
#pragma once

#include <string>
#include <vector>

#include "tree/arg_info.h"
#include "tree/node.h"

namespace quillet {

using NodeList = std::vector<CNode*>;
using NodeSpan = std::span<CNode* const>;

struct CStmt : CNode {};

// Where the sub-expressions of an expression stand, found once for all of them.
struct SubExprView {
  const CNode* list = nullptr;  // a CTestListStarExpr or a CListmakerNode that has them
  CNode* single = nullptr;      // or the one element of a list display
  int32_t count = 0;

  CNode* At(int32_t index) const;
};

struct CExpression : CNode {
  // The sub-expressions that can be unpacked, as in `(1, 2)`; null and 0 for any expression that
  // has none. They dispatch on the kind (CAtom and CTestListStarExpr have their own). Time is linear
  // in the nesting of brackets, without recursion; who wants all of them takes the view.
  CNode* GetSubExpr(int32_t index) const { return GetSubExprView().At(index); }
  int32_t GetSubExprCount() const { return GetSubExprView().count; }
  SubExprView GetSubExprView() const;
};

struct CPatternNode : CNode {};

// ---- statements ----

struct CClassdefStmt : CStmt {
  Text GetClassName() const { return GetChildText(1); }
  UsedArgList GetBaseClassList() const;
  // What stands between the brackets, as GetUsedArgInfoList takes it; null where that list is empty.
  CNode* GetBaseClassesNode() const;
};
struct CFuncdefStmt : CStmt {
  Text GetFunctionName() const { return GetChildText(1); }
  CParametersNode* GetParameters() const;  // TypeError for another class
  CNode* GetReturnType() const;            // null without "->"; TypeError for what is no CExpression
  CNode* GetSuite() const { return LastChild(); }
};
struct CIfStmt : CStmt {
  // The first test only. TypeError for what is no CExpression.
  CNode* GetTestExpression() const { return Expect<CExpression>(ChildAt(1)); }
};
struct CMatchStmt : CStmt {
  CNode* GetTestExpression() const { return Expect<CExpression>(ChildAt(1)); }
};
struct CCaseStmt : CStmt {
  CNode* GetPattern() const { return ChildAt(1); }
  // Child 2 of a node of four children or more: the ":" of `case x: y`, which callers tolerate.
  CNode* GetGuard() const { return child_count >= 4 ? children[2] : nullptr; }
  CNode* GetBody() const { return ChildAtIs(-1, tok::COLON) ? nullptr : LastChild(); }
};
struct CDelStmt : CStmt {
  NodeList GetExpressions() const;
};
struct CGlobalStmt : CStmt {
  std::vector<Text> GetUtf8NameList() const;  // none where there are fewer than two children
};
struct CNonlocalStmt : CStmt {
  std::vector<Text> GetUtf8NameList() const;
};
struct CForStmt : CStmt {
  CNode* GetTarget() const { return ChildAt(1); }
  CNode* GetInExpression() const { return ChildAt(3); }
  CNode* GetBody() const { return ChildAt(5); }
  // The last of exactly eight children; the nine of a real for-else have none by this accessor.
  CNode* GetElseBody() const { return child_count == 8 ? LastChild() : nullptr; }
};
struct CWithStmt : CStmt {
  NodeList GetWithItems() const;
};
struct CPassStmt : CStmt {};
struct CExprStmt : CStmt {
  int64_t GetEqualCount() const {
    int64_t count = 0;
    for (uint32_t i = 0; i < child_count; ++i) count += ChildIs(i, tok::EQUAL);
    return count;
  }
  CAnnotatedAssignNode* GetAnnotatedAssignNode() const;
  CNode* GetInitialTestExpr() const { return ChildAt(0); }
  // ValueError "Not enough ='s" past the last one.
  CNode* GetPostEqualsTestExpr(int64_t equal_num) const;
  // The operator's text, or none. "|=" and "@=" count as none and ",=" as one.
  Text GetAugAssignOp() const;
};
struct CReturnStmt : CStmt {
  CNode* GetValue() const { return Child(1); }
};
struct CWithTypeParameters : CStmt {
  NodeList GetTypeParameters() const;
  NodeSpan TypeParameterSpan() const { return {children, child_count ? child_count - 1 : 0}; }
  CNode* GetTypeParameterScopedStatement() const { return ChildAt(-1); }
};

// ---- expressions ----

struct CAtom : CExpression {
  // The count is that of the inside wherever that has one, so `[(1, 2)]` has two and not one.
  CNode* GetSubExpr(int32_t index) const { return GetSubExprView().At(index); }
  int32_t GetSubExprCount() const { return GetSubExprView().count; }
  SubExprView GetSubExprView() const;
  // "(", "[" or "{", or none. ValueError "Atom node with no children".
  Text GetInitialBracket() const;
  // True for whatever is no comprehension, a sequence of strings too.
  bool IsLiteral() const { return !IsComprehension(); }
  // A list, dict or set comprehension, and a generator expression as well: no bracket is tested.
  bool IsComprehension() const;
  bool IsTwoPlusStringLiterals() const { return isa<CStringLiteral>(Child(0)); }
};
struct COperatorExpression : CExpression {
  // Text of operator `i`, "not in" and "is not" joined with a blank; none where there is none. The
  // joined forms are static.
  Text GetOperatorStr(int64_t i) const;
  int64_t GetTermCount() const {
    if (child_count < 2) return 0;
    return child_count == 2 ? 1 : child_count / 2 + 1;
  }
  CNode* GetTerm(int64_t i) const;
};
struct CIfElseExpression : CExpression {};
struct CStarExpression : CExpression {
  // TypeError for what is no CExpression.
  CNode* GetStarredExpression() const { return Expect<CExpression>(ChildAt(1)); }
};
struct CDottedName : CExpression {};
struct CLambdaExpr : CExpression {
  CNode* GetArgumentsNode() const { return ChildAtIs(1, tok::COLON) ? nullptr : children[1]; }
  CNode* GetBodyExpr() const { return ChildAt(-1); }
};
struct CTestExpr : CExpression {};
struct CYieldExpr : CExpression {
  CNode* GetValue() const;
  bool IsYieldFrom() const;
};
struct CTestListStarExpr : CExpression {
  // ValueErrors "Not enough expressions in list" and "Elenment {} of {} needs to be a CExpression;
  // fChildren = {}".
  CNode* GetSubExpr(int32_t index) const;
  int32_t GetSubExprCount() const;
  bool IsTuple() const { return !IsGenExpr() && HasChildWithCode(tok::COMMA); }
  bool IsGenExpr() const { return isa<CCompForNode>(Child(1)); }
};
struct CNameLiteral : CExpression {};
struct CKeywordLiteral : CExpression {};
struct CAtomExpr : CExpression {
  CNode* GetPrefix() const;
  CNode* GetAtom() const;
  NodeList GetTrailers() const;
  // The same without a list: the index of the first trailer, and a view of all of them.
  uint32_t FirstTrailer() const { return GetPrefix() ? 2 : 1; }
  NodeSpan TrailerSpan() const { return child_count == 0 ? NodeSpan() : fChildren().subspan(FirstTrailer()); }
};
struct CPower : CExpression {
  // The newer grammar nests the atom in a CAtomExpr, the older holds it directly.
  CNode* GetAtom() const;
  NodeList GetTrailers() const;
  // The same without a list.
  NodeSpan TrailerSpan() const;
  CNode* GetExponentNode() const { return HasChildWithCode(tok::DOUBLESTAR) ? LastChild() : nullptr; }
};
struct CNumberLiteral : CExpression {
  bool IsFloat() const;
};
struct CStringLiteral : CExpression {
  bool IsUnicode() const;
  bool IsBytes() const;
  // The text between the quotes, escapes as they stand; a view of fText.
  Text GetStringContents() const;
  // True for a literal with an "f" among its prefix letters, whose value is not known.
  bool IsFormatted() const;
};
struct CFactorExpr : CExpression {
  Text GetUnaryOperator() const;
};
struct CNamedExpr : CExpression {
  CNode* GetAssignedName() const { return ChildAt(0); }
  CNode* GetRightHandExpression() const { return ChildAt(2); }
};

// ---- patterns ----

struct CSequencePatternNode : CPatternNode {};
struct CMappingPatternNode : CPatternNode {};
struct CClassArgumentPatternNode : CPatternNode {};
struct CClassPatternNode : CPatternNode {};

// ---- the rest ----

struct CImportNamesStmt : CNode {
  std::vector<CAsName> GetAsNameList() const;
  // What ForEachAsName goes through.
  CNode* GetNamesNode() const { return ChildAt(1); }
};
struct CFromImportStmt : CNode {
  bool HasFromString() const { return GetImportIndex() >= 2; }
  // The leaves and names that its text is made of.
  NodeSpan FromNodes() const;
  std::string GetFromString() const;  // empty where HasFromString is false (the host's None)
  bool GetImportStar() const;
  std::vector<CAsName> GetAsNameList() const;
  // What ForEachAsName goes through: the names behind `import`, without their brackets.
  CNode* GetNamesNode() const;
  int32_t GetImportIndex() const;
};
struct CSingleUsedArgumentNode : CNode {
  Text GetPrefix() const;
  CNode* GetName() const;
  CNode* GetValue() const;  // the node itself where there is no "="
  bool IsUnparenthesizedGenExpr() const;
  CNode* GetNameAssigned() const;
  CNode* GetNamedRightHandExpression() const;
};
struct CFunctionParameterDef : CNode {
  CNode* GetNestedListNode() const;
  CNode* GetName() const;
  CNode* GetTypeExpr() const;
};
struct CDefiningArglistNode : CNode {};
struct CUsedArglistNode : CNode {};
struct CParametersNode : CNode {};
struct CSingleDecorator : CNode {
  CNode* GetDottedName() const { return ChildAt(1); }
  // Empty for `@foo()` and `@foo`.
  UsedArgList GetUsedArgList() const;
  // What stands between the brackets; null where that list is empty.
  CNode* GetUsedArgsNode() const;
};
struct CMultipleDecorators : CNode {};
struct CWithItem : CNode {
  CNode* GetExpression() const { return ChildAt(0); }
  CNode* GetTarget() const { return ChildAt(2); }
};
struct CExceptClause : CNode {
  CNode* GetExceptionType() const { return Child(1); }
  CNode* GetTarget() const;
};
struct CAnnotatedAssignNode : CNode {
  CNode* GetTypeHintNode() const { return ChildAt(1); }
  CNode* GetPostEqualsTestExpr() const { return Child(3); }
};
struct CBinaryOp : CNode {};
struct CYieldArg : CNode {
  CNode* GetValue() const;
  bool IsYieldFrom() const;
};
struct CCompForNode : CNode {
  bool IsAsync() const { return ChildAtIs(0, word::kAsync); }
  CNode* GetTargetNode() const;
  CNode* GetInNode() const;
  CNode* GetCompIterNode() const;

 private:
  // The node itself, or the one nested in it behind `async`; that one is flat.
  const CCompForNode* Flat() const;
};
struct CListmakerNode : CNode {
  int32_t GetSubExprCount() const;
  CNode* GetSubExpr(int32_t index) const;  // TypeError for what is no CExpression
};
struct CTrailer : CNode {
  Text GetDotName() const {
    if (child_count != 2 || children[0] == nullptr || children[0]->code != tok::DOT) return kNoText;
    return isa<CNameLiteral>(children[1]) ? children[1]->fText() : kNoText;
  }
  CNode* GetNestedNode() const {
    return child_count == 3 && (ChildIs(0, tok::LSQB) || ChildIs(0, tok::LPAR)) ? children[1] : nullptr;
  }
  Text GetInitialToken() const;  // ValueError "Trailer node with no children"
};
struct CTypeParameter : CNode {
  CNode* GetName() const;
  Text GetPrefix() const;
  CNode* GetSpecNode() const;
};

inline CNode* CAtomExpr::GetPrefix() const {
  if (child_count < 2) return nullptr;
  CNode* first = children[0];
  // `await` in front of a trailer is a plain word.
  return isa<CKeywordLiteral>(first) && first->code == word::kAwait && !isa<CTrailer>(children[1]) ? first : nullptr;
}
inline CAnnotatedAssignNode* CExprStmt::GetAnnotatedAssignNode() const {
  return dyn_cast<CAnnotatedAssignNode>(ChildAt(1));
}

#define QUILLET_NODE(name, base)                                                 \
  static_assert(sizeof(name) == sizeof(CNode), "subclasses add accessors only"); \
  static_assert(std::is_trivially_destructible_v<name>);
#include "tree/node_kinds.def"

// ---- literals and parentheses (tree/literals.cc) ----

// True for an atom that is clearly a set display.
bool IsSetLiteral(const CAtom* node);
// Narrower than CTestListStarExpr::IsGenExpr: looks for a direct child "for".
bool IsGenExpression(const CAtom* node);
bool IsTupleLiteralNode(const CNode* node);
// The elements of a parenthesised tuple; false where the host sees None.
bool ExpandSeqLiteral(CNode* node, NodeList& elements);
// The inside of `( test )`, however deep; any other node as it is.
CNode* DropSimpleParens(CNode* node);

}  // namespace quillet
