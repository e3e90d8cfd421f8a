// What the accessors read out of real statements under both grammars, and out of hand-made nodes
// where no statement gives the shape.
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "tests/core/support/expect_error.h"
#include "tests/core/support/parse_helper.h"
#include "tree/arg_info.h"
#include "tree/nodes.h"

namespace quillet {
namespace {

using test::ExpectError;
using test::Parse2;
using test::Parse3;
using test::ParserOf;
using test::ParseStatement;
using test::Tree;

// The texts of a node's leaves, one blank between any two; "None" for no node.
std::string Show(const CNode* node) {
  if (node == nullptr) return "None";
  if (node->IsLeaf()) return std::string(node->fText());
  std::string text;
  for (const CNode* child : node->fChildren()) text += (text.empty() ? "" : " ") + Show(child);
  return text;
}

std::vector<std::string> Show(const NodeList& nodes) {
  std::vector<std::string> texts;
  for (const CNode* node : nodes) texts.push_back(Show(node));
  return texts;
}

// An entry as prefix, name, ":" type, "=" value; a nested list in brackets.
std::string Show(const CArgInfo& info) {
  std::string text(info.prefix);
  if (info.name != nullptr) text += Show(info.name);
  if (info.type_expr != nullptr) text += ":" + Show(info.type_expr);
  if (info.value != nullptr) text += "=" + Show(info.value);
  return text;
}

std::vector<std::string> Show(const UsedArgList& list) {
  std::vector<std::string> texts;
  for (const CArgInfo& info : list) texts.push_back(Show(info));
  return texts;
}

std::vector<std::string> Show(const ArgList& list) {
  std::vector<std::string> texts;
  for (const ArgEntry& entry : list) {
    if (!entry.is_list) {
      texts.push_back(Show(entry.arg));
      continue;
    }
    std::string nested = "[";
    for (const std::string& text : Show(entry.list)) nested += (nested.size() > 1 ? " " : "") + text;
    texts.push_back(nested + "]");
  }
  return texts;
}

using Texts = std::vector<std::string>;

// Nodes without records, made by hand.
CNodeFactory& Factory() { return ParserOf(true).factory(); }
template <class T>
T* Bare(std::initializer_list<CNode*> children) {
  T* node = Factory().NewBare<T>();
  Factory().SetChildren(node, children);
  return node;
}
template <class T = CNode>
T* BareLeaf(Text text) {
  T* node = Factory().NewBare<T>();
  node->text = text.data();
  node->text_length = static_cast<uint32_t>(text.size());
  node->code = CodeOfText(text);
  return node;
}

// Runs a test body under both grammars.
template <class Fn>
void UnderBoth(Fn&& fn) {
  for (bool py3 : {false, true}) {
    SCOPED_TRACE(py3 ? "grammar of 3.8" : "grammar of 2.7");
    fn(py3);
  }
}

// ---- the shape of trees ----

TEST(CatalogueTest, ARuleThatMatchedOneChildIsNoNode) {
  UnderBoth([](bool py3) {
    EXPECT_EQ(ParseStatement(py3, "x").root()->kind, NodeKind::kCNameLiteral);
    Tree either = ParseStatement(py3, "a or b");
    EXPECT_EQ(either.root()->kind, NodeKind::kCOperatorExpression);
    EXPECT_EQ(either.root()->GetStateName(), "or_test");
    EXPECT_EQ(ParseStatement(py3, "pass").root()->kind, NodeKind::kCKeywordLiteral);
  });
}

TEST(CatalogueTest, PowerIsThereUnderTheNewerGrammarOnlyWithItsOperator) {
  EXPECT_EQ(Parse3("a . b").root()->kind, NodeKind::kCAtomExpr);
  EXPECT_EQ(Parse3("a . b ** 2").root()->kind, NodeKind::kCPower);
  EXPECT_EQ(Parse2("a . b").root()->kind, NodeKind::kCPower);
}

TEST(CatalogueTest, AListDisplayHoldsAListmakerUnderTheOlderGrammarOnly) {
  EXPECT_NE(Parse2("[ a , b ]").Find<CListmakerNode>(), nullptr);
  Tree newer = Parse3("[ a , b ]");
  EXPECT_EQ(newer.Find<CListmakerNode>(), nullptr);
  EXPECT_NE(newer.Find<CTestListStarExpr>(), nullptr);
}

// ---- operators ----

TEST(OperatorExpressionTest, NotHasOneTermWhateverIsAskedFor) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "not x");
    auto* node = tree.Find<COperatorExpression>();
    ASSERT_NE(node, nullptr);
    EXPECT_EQ(node->GetTermCount(), 1);
    EXPECT_EQ(Show(node->GetTerm(7)), "x");
    EXPECT_EQ(Show(node->GetTerm(-1)), "x");
    EXPECT_EQ(node->GetOperatorStr(0), "not");
    EXPECT_TRUE(IsNone(node->GetOperatorStr(1)));
    EXPECT_TRUE(IsNone(node->GetOperatorStr(-1)));
  });
}

TEST(OperatorExpressionTest, OperatorsOfTwoWordsAreJoinedWithABlank) {
  UnderBoth([](bool py3) {
    EXPECT_EQ(ParseStatement(py3, "a not in b").Find<COperatorExpression>()->GetOperatorStr(0), "not in");
    EXPECT_EQ(ParseStatement(py3, "a is not b").Find<COperatorExpression>()->GetOperatorStr(0), "is not");
    EXPECT_EQ(ParseStatement(py3, "a is b").Find<COperatorExpression>()->GetOperatorStr(0), "is");
  });
  EXPECT_EQ(Parse2("a <> b").Find<COperatorExpression>()->GetOperatorStr(0), "<>");
}

TEST(OperatorExpressionTest, AChainHasATermMoreThanOperators) {
  Tree tree = Parse3("a < b < c");
  auto* node = tree.Find<COperatorExpression>();
  EXPECT_EQ(node->GetTermCount(), 3);
  EXPECT_EQ(Show(node->GetTerm(2)), "c");
  EXPECT_EQ(node->GetTerm(3), nullptr);
  EXPECT_EQ(node->GetTerm(INT64_MAX), nullptr);
  EXPECT_EQ(node->GetOperatorStr(1), "<");
  EXPECT_TRUE(IsNone(node->GetOperatorStr(2)));
  EXPECT_TRUE(IsNone(node->GetOperatorStr(-1)));
  EXPECT_TRUE(IsNone(node->GetOperatorStr(INT64_MIN)));
  EXPECT_TRUE(IsNone(node->GetOperatorStr(INT64_MAX)));
}

TEST(OperatorExpressionTest, HandMadeOperatorsAreReadAsFarAsTheyHaveText) {
  CNode* a = BareLeaf("a");
  auto* op = Bare<CNode>({BareLeaf("really"), BareLeaf("not")});
  EXPECT_EQ(Bare<COperatorExpression>({a, op, a})->GetOperatorStr(0), "really not");
  auto* interior = Bare<CNode>({BareLeaf("not"), Bare<CNode>({a, a})});
  EXPECT_TRUE(IsNone(Bare<COperatorExpression>({a, interior, a})->GetOperatorStr(0)));
  EXPECT_TRUE(IsNone(Bare<COperatorExpression>({a, Bare<CNode>({a, a, a}), a})->GetOperatorStr(0)));
  EXPECT_TRUE(IsNone(Bare<COperatorExpression>({a, nullptr, a})->GetOperatorStr(0)));
  EXPECT_EQ(Bare<COperatorExpression>({a})->GetTermCount(), 0);
}

TEST(FactorTest, OnlyTheThreeSignsAreUnaryOperators) {
  for (const char* statement : {"- x", "+ x", "~ x"}) {
    Tree tree = Parse3(statement);
    EXPECT_EQ(tree.Find<CFactorExpr>()->GetUnaryOperator(), Text(statement, 1));
  }
  EXPECT_TRUE(IsNone(Bare<CFactorExpr>({BareLeaf("*"), BareLeaf("x")})->GetUnaryOperator()));
  ExpectError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable",
              [] { Factory().NewBare<CFactorExpr>()->GetUnaryOperator(); });
}

// ---- lists of expressions ----

TEST(TestListTest, ATupleHasItsElements) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "a , b");
    auto* node = tree.Find<CTestListStarExpr>();
    EXPECT_TRUE(node->IsTuple());
    EXPECT_FALSE(node->IsGenExpr());
    EXPECT_EQ(node->GetSubExprCount(), 2);
    EXPECT_EQ(Show(node->GetSubExpr(1)), "b");
    ExpectError(ErrorKind::kValueError, "Not enough expressions in list", [&] { node->GetSubExpr(2); });
    // Through the base class too.
    EXPECT_EQ(static_cast<CExpression*>(node)->GetSubExprCount(), 2);
    EXPECT_EQ(Show(static_cast<CExpression*>(node)->GetSubExpr(0)), "a");
  });
}

TEST(TestListTest, ATrailingCommaAddsNoElement) {
  EXPECT_EQ(Parse3("a , b ,").Find<CTestListStarExpr>()->GetSubExprCount(), 2);
  EXPECT_EQ(Parse3("a ,").Find<CTestListStarExpr>()->GetSubExprCount(), 1);
}

TEST(TestListTest, AGeneratorExpressionHasNoElements) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "( i for i in x )");
    auto* node = tree.Find<CTestListStarExpr>();
    EXPECT_TRUE(node->IsGenExpr());
    EXPECT_FALSE(node->IsTuple());
    EXPECT_EQ(node->GetSubExprCount(), 0);
    EXPECT_EQ(node->GetSubExpr(0), nullptr);
  });
}

TEST(TestListTest, AnElementThatIsNoExpressionIsAValueErrorThatNamesTheChildren) {
  auto* node = Bare<CTestListStarExpr>({BareLeaf("x"), BareLeaf(",")});
  ExpectError(ErrorKind::kValueError,
              "Elenment 0 of <class 'quillet.tarvex.CTestListStarExpr'>: CTestListStarExpr needs to be a CExpression; "
              "fChildren = [<class 'quillet.tarvex.CNode'>: CNode, <class 'quillet.tarvex.CNode'>: CNode]",
              [&] { node->GetSubExpr(0); });
  ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { node->GetSubExpr(-2); });
}

TEST(ListmakerTest, ElementsPastTheEndAreNone) {
  Tree tree = Parse2("[ a , b , ]");
  auto* node = tree.Find<CListmakerNode>();
  EXPECT_EQ(node->GetSubExprCount(), 2);
  EXPECT_EQ(Show(node->GetSubExpr(1)), "b");
  EXPECT_EQ(node->GetSubExpr(2), nullptr);
}

TEST(ListmakerTest, AComprehensionHasNoElements) {
  Tree tree = Parse2("[ i for i in x ]");
  auto* node = tree.Find<CListmakerNode>();
  EXPECT_EQ(node->GetSubExprCount(), 0);
  EXPECT_EQ(node->GetSubExpr(0), nullptr);
}

TEST(ListmakerTest, AnElementThatIsNoExpressionIsATypeError) {
  auto* node = Bare<CListmakerNode>({BareLeaf("x"), BareLeaf(",")});
  ExpectError(ErrorKind::kTypeError, "Expected CExpression, got CNode", [&] { node->GetSubExpr(0); });
}

// ---- comprehensions ----

TEST(CompForTest, APlainClause) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "( i for i in x if i )");
    auto* node = tree.Find<CCompForNode>();
    EXPECT_FALSE(node->IsAsync());
    EXPECT_EQ(Show(node->GetTargetNode()), "i");
    EXPECT_EQ(Show(node->GetInNode()), "x");
    EXPECT_EQ(Show(node->GetCompIterNode()), "if i");
    EXPECT_EQ(ParseStatement(py3, "( i for i in x )").Find<CCompForNode>()->GetCompIterNode(), nullptr);
  });
}

TEST(CompForTest, AnAsyncClauseIsReadThroughTheNodeNestedInIt) {
  Tree tree = ParseStatement(true, "( i async for i in x if i )", true);
  auto* node = tree.Find<CCompForNode>();
  ASSERT_EQ(node->ChildCount(), 2u);
  EXPECT_TRUE(node->IsAsync());
  EXPECT_EQ(Show(node->GetTargetNode()), "i");
  EXPECT_EQ(Show(node->GetInNode()), "x");
  EXPECT_EQ(Show(node->GetCompIterNode()), "if i");
}

TEST(CompForTest, AFlatAsyncClauseIsReadOnePlaceFurther) {
  auto leaf = [](Text text) { return BareLeaf(text); };
  auto* node = Bare<CCompForNode>({leaf("async"), leaf("for"), leaf("i"), leaf("in"), leaf("x")});
  EXPECT_EQ(Show(node->GetTargetNode()), "i");
  EXPECT_EQ(Show(node->GetInNode()), "x");
  EXPECT_EQ(node->GetCompIterNode(), nullptr);
  auto* more = Bare<CCompForNode>({leaf("async"), leaf("for"), leaf("i"), leaf("in"), leaf("x"), leaf("y")});
  EXPECT_EQ(Show(more->GetCompIterNode()), "y");
}

TEST(CompForTest, ANodeWithoutChildrenFails) {
  ExpectError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable",
              [] { Factory().NewBare<CCompForNode>()->IsAsync(); });
  ExpectError(ErrorKind::kIndexError, "list index out of range",
              [] { Bare<CCompForNode>({BareLeaf("for")})->GetInNode(); });
}

// ---- atoms, trailers, powers ----

TEST(AtomExprTest, AwaitIsAPrefix) {
  Tree tree = ParseStatement(true, "await x . y", true);
  auto* node = tree.Find<CAtomExpr>();
  ASSERT_NE(node->GetPrefix(), nullptr);
  EXPECT_EQ(node->GetPrefix()->kind, NodeKind::kCKeywordLiteral);
  EXPECT_EQ(Show(node->GetAtom()), "x");
  EXPECT_EQ(Show(node->GetTrailers()), Texts{". y"});
  EXPECT_EQ(node->FirstTrailer(), 2u);
  EXPECT_EQ(node->TrailerSpan().size(), 1u);
}

TEST(AtomExprTest, WithoutAPrefixTrailersBeginAtOnce) {
  Tree tree = Parse3("x . y ( z )");
  auto* node = tree.Find<CAtomExpr>();
  EXPECT_EQ(node->GetPrefix(), nullptr);
  EXPECT_EQ(Show(node->GetAtom()), "x");
  EXPECT_EQ(Show(node->GetTrailers()), (Texts{". y", "( z )"}));
  EXPECT_EQ(node->TrailerSpan()[1], node->GetTrailers()[1]);
}

TEST(AtomExprTest, AwaitInFrontOfATrailerIsAWord) {
  auto* trailer = Bare<CTrailer>({BareLeaf("."), BareLeaf<CNameLiteral>("x")});
  auto* node = Bare<CAtomExpr>({BareLeaf<CKeywordLiteral>("await"), trailer});
  EXPECT_EQ(node->GetPrefix(), nullptr);
  EXPECT_EQ(Show(node->GetAtom()), "await");
}

TEST(AtomExprTest, ANodeWithoutChildrenHasNoAtomAndNoTrailers) {
  auto* node = Factory().NewBare<CAtomExpr>();
  EXPECT_EQ(node->GetAtom(), nullptr);
  EXPECT_TRUE(node->GetTrailers().empty());
  EXPECT_TRUE(node->TrailerSpan().empty());
}

TEST(PowerTest, TheNewerGrammarIsReadThroughTheAtomExpression) {
  Tree tree = Parse3("a . b ** 2");
  auto* node = tree.Find<CPower>();
  EXPECT_EQ(Show(node->GetAtom()), "a");
  EXPECT_EQ(Show(node->GetTrailers()), Texts{". b"});
  EXPECT_EQ(Show(node->GetExponentNode()), "2");
  Tree plain = Parse3("x ** 2");
  EXPECT_EQ(Show(plain.Find<CPower>()->GetAtom()), "x");
  EXPECT_TRUE(plain.Find<CPower>()->GetTrailers().empty());
}

TEST(PowerTest, UnderTheOlderGrammarTrailersEndBeforeTheOperator) {
  Tree tree = Parse2("a . b ** 2");
  auto* node = tree.Find<CPower>();
  EXPECT_EQ(Show(node->GetAtom()), "a");
  EXPECT_EQ(Show(node->GetTrailers()), Texts{". b"});
  EXPECT_EQ(node->TrailerSpan().size(), 1u);
  EXPECT_EQ(Show(node->GetExponentNode()), "2");
  EXPECT_EQ(Parse2("a . b").Find<CPower>()->GetExponentNode(), nullptr);
}

TEST(TrailerTest, OnlyANameBehindADotIsADotName) {
  Tree dot = Parse3("a . b");
  EXPECT_EQ(dot.Find<CTrailer>()->GetDotName(), "b");
  EXPECT_EQ(dot.Find<CTrailer>()->GetInitialToken(), ".");
  EXPECT_EQ(dot.Find<CTrailer>()->GetNestedNode(), nullptr);
  EXPECT_TRUE(IsNone(Bare<CTrailer>({BareLeaf("."), BareLeaf<CKeywordLiteral>("if")})->GetDotName()));
  EXPECT_TRUE(IsNone(Bare<CTrailer>({nullptr, BareLeaf<CNameLiteral>("x")})->GetDotName()));
}

TEST(TrailerTest, NothingBetweenTheBracketsIsNone) {
  Tree call = Parse3("f ( )");
  EXPECT_EQ(call.Find<CTrailer>()->GetNestedNode(), nullptr);
  EXPECT_TRUE(IsNone(call.Find<CTrailer>()->GetDotName()));
  EXPECT_EQ(Show(Parse3("f ( x )").Find<CTrailer>()->GetNestedNode()), "x");
  Tree subscript = Parse3("f [ x ]");
  EXPECT_EQ(Show(subscript.Find<CTrailer>()->GetNestedNode()), "x");
  EXPECT_EQ(subscript.Find<CTrailer>()->GetInitialToken(), "[");
}

TEST(TrailerTest, NoChildrenAreAValueError) {
  ExpectError(ErrorKind::kValueError, "Trailer node with no children",
              [] { Factory().NewBare<CTrailer>()->GetInitialToken(); });
}

// ---- the other expressions ----

TEST(StarExpressionTest, TheStarredPartMustBeAnExpression) {
  EXPECT_EQ(Show(Parse3("* a , b").Find<CStarExpression>()->GetStarredExpression()), "a");
  auto* dots = Bare<CStarExpression>({BareLeaf("*"), BareLeaf("...")});
  ExpectError(ErrorKind::kTypeError, "Expected CExpression, got CNode", [&] { dots->GetStarredExpression(); });
  EXPECT_EQ(Bare<CStarExpression>({BareLeaf("*"), nullptr})->GetStarredExpression(), nullptr);
}

TEST(LambdaTest, WithoutParametersThereIsNoArgumentsNode) {
  UnderBoth([](bool py3) {
    Tree bare = ParseStatement(py3, "lambda : 0");
    EXPECT_EQ(bare.Find<CLambdaExpr>()->GetArgumentsNode(), nullptr);
    EXPECT_EQ(Show(bare.Find<CLambdaExpr>()->GetBodyExpr()), "0");
    Tree tree = ParseStatement(py3, "lambda a , b : a");
    EXPECT_EQ(Show(tree.Find<CLambdaExpr>()->GetArgumentsNode()), "a , b");
    EXPECT_EQ(Show(tree.Find<CLambdaExpr>()->GetBodyExpr()), "a");
  });
}

TEST(NamedExprTest, BothSides) {
  Tree tree = Parse3("( a := 1 )");
  EXPECT_EQ(Show(tree.Find<CNamedExpr>()->GetAssignedName()), "a");
  EXPECT_EQ(Show(tree.Find<CNamedExpr>()->GetRightHandExpression()), "1");
}

TEST(YieldTest, OnlyYieldFromIsOne) {
  Tree from = Parse3("yield from x");
  EXPECT_EQ(Show(from.Find<CYieldExpr>()->GetValue()), "x");
  EXPECT_TRUE(from.Find<CYieldExpr>()->IsYieldFrom());
  EXPECT_EQ(Show(from.Find<CYieldArg>()->GetValue()), "x");
  EXPECT_TRUE(from.Find<CYieldArg>()->IsYieldFrom());
  UnderBoth([](bool py3) {
    Tree plain = ParseStatement(py3, "yield x");
    EXPECT_EQ(Show(plain.Find<CYieldExpr>()->GetValue()), "x");
    EXPECT_FALSE(plain.Find<CYieldExpr>()->IsYieldFrom());
  });
}

TEST(YieldTest, ABareYieldIsAKeywordLeaf) { EXPECT_EQ(Parse3("yield").root()->kind, NodeKind::kCKeywordLiteral); }

TEST(YieldTest, HandMadeNodesOfOneChild) {
  auto* arg = Bare<CYieldArg>({BareLeaf("x")});
  EXPECT_EQ(Show(arg->GetValue()), "x");
  EXPECT_FALSE(arg->IsYieldFrom());
  auto* yield = Bare<CYieldExpr>({BareLeaf<CKeywordLiteral>("yield")});
  EXPECT_EQ(yield->GetValue(), nullptr);
  EXPECT_FALSE(yield->IsYieldFrom());
}

// ---- assignments ----

TEST(ExprStmtTest, AChainOfAssignments) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "a = b = c");
    auto* node = tree.Find<CExprStmt>();
    EXPECT_EQ(node->GetEqualCount(), 2);
    EXPECT_EQ(Show(node->GetInitialTestExpr()), "a");
    EXPECT_EQ(Show(node->GetPostEqualsTestExpr(0)), "b");
    EXPECT_EQ(Show(node->GetPostEqualsTestExpr(1)), "c");
    ExpectError(ErrorKind::kValueError, "Not enough ='s", [&] { node->GetPostEqualsTestExpr(2); });
    ExpectError(ErrorKind::kValueError, "Not enough ='s", [&] { node->GetPostEqualsTestExpr(INT64_MAX); });
    ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { node->GetPostEqualsTestExpr(INT64_MIN); });
    EXPECT_EQ(Show(node->GetPostEqualsTestExpr(-2)), "=");  // counted from the end, as in any list
    EXPECT_TRUE(IsNone(node->GetAugAssignOp()));
    EXPECT_EQ(node->GetAnnotatedAssignNode(), nullptr);
  });
}

TEST(ExprStmtTest, AugmentedOperators) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "a += 1");
    auto* node = tree.Find<CExprStmt>();
    EXPECT_EQ(node->GetEqualCount(), 0);
    EXPECT_EQ(node->GetAugAssignOp(), "+=");
    EXPECT_EQ(Show(node->GetPostEqualsTestExpr(0)), "1");
  });
  for (Text op : {"+=", "-=", "*=", "/=", "%=", "&=", ",=", "^=", "<<=", ">>=", "**=", "//="}) {
    EXPECT_EQ(Bare<CExprStmt>({BareLeaf("a"), BareLeaf(op), BareLeaf("b")})->GetAugAssignOp(), op);
  }
}

TEST(ExprStmtTest, OrAndMatrixAssignmentsCountAsHavingNoOperator) {
  EXPECT_TRUE(IsNone(Parse3("a |= 1").Find<CExprStmt>()->GetAugAssignOp()));
  EXPECT_TRUE(IsNone(Parse3("a @= 1").Find<CExprStmt>()->GetAugAssignOp()));
  EXPECT_TRUE(IsNone(Bare<CExprStmt>({BareLeaf("a"), BareLeaf("+"), BareLeaf("b")})->GetAugAssignOp()));
  EXPECT_TRUE(IsNone(Bare<CExprStmt>({BareLeaf("a")})->GetAugAssignOp()));
}

TEST(ExprStmtTest, Annotations) {
  Tree bare = Parse3("a : int");
  auto* annotation = bare.Find<CExprStmt>()->GetAnnotatedAssignNode();
  ASSERT_NE(annotation, nullptr);
  EXPECT_EQ(Show(annotation->GetTypeHintNode()), "int");
  EXPECT_EQ(annotation->GetPostEqualsTestExpr(), nullptr);
  Tree with_value = Parse3("a : int = 1");
  EXPECT_EQ(Show(with_value.Find<CAnnotatedAssignNode>()->GetPostEqualsTestExpr()), "1");
}

// ---- definitions ----

TEST(ClassdefTest, BaseClasses) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "class A ( B , C ) :");
    EXPECT_EQ(tree.Find<CClassdefStmt>()->GetClassName(), "A");
    EXPECT_EQ(Show(tree.Find<CClassdefStmt>()->GetBaseClassList()), (Texts{"=B", "=C"}));
    EXPECT_TRUE(ParseStatement(py3, "class A :").Find<CClassdefStmt>()->GetBaseClassList().empty());
    EXPECT_TRUE(ParseStatement(py3, "class A ( ) :").Find<CClassdefStmt>()->GetBaseClassList().empty());
  });
  EXPECT_EQ(Show(Parse3("class A ( B , metaclass = M ) :").Find<CClassdefStmt>()->GetBaseClassList()),
            (Texts{"=B", "metaclass=M"}));
}

TEST(FuncdefTest, TheReturnTypeStandsBehindTheArrow) {
  Tree tree = Parse3("def f ( ) -> int :");
  auto* node = tree.Find<CFuncdefStmt>();
  EXPECT_EQ(node->GetFunctionName(), "f");
  EXPECT_EQ(Show(node->GetReturnType()), "int");
  EXPECT_EQ(Show(node->GetParameters()), "( )");
  EXPECT_EQ(node->GetSuite(), node->LastChild());
  EXPECT_EQ(Parse3("def f ( ) :").Find<CFuncdefStmt>()->GetReturnType(), nullptr);
}

TEST(FuncdefTest, AReturnTypeThatIsNoExpressionIsATypeError) {
  Tree tree = Parse3("def f ( ) -> ... :");
  ExpectError(ErrorKind::kTypeError, "Expected CExpression, got CNode",
              [&] { tree.Find<CFuncdefStmt>()->GetReturnType(); });
}

TEST(FuncdefTest, OnlyTheArrowItselfCounts) {
  CNode* x = BareLeaf<CNameLiteral>("x");
  auto* node = Bare<CFuncdefStmt>({x, x, x, BareLeaf("@="), x});
  EXPECT_EQ(node->GetReturnType(), nullptr);
  ExpectError(ErrorKind::kTypeError, "Expected CParametersNode, got CNameLiteral", [&] { node->GetParameters(); });
}

TEST(DecoratorTest, EmptyBracketsHaveNoArgumentsHereToo) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "@ a . b ( x , y )");
    EXPECT_EQ(Show(tree.Find<CSingleDecorator>()->GetDottedName()), "a . b");
    EXPECT_EQ(Show(tree.Find<CSingleDecorator>()->GetUsedArgList()), (Texts{"=x", "=y"}));
    EXPECT_TRUE(ParseStatement(py3, "@ foo ( )").Find<CSingleDecorator>()->GetUsedArgList().empty());
    EXPECT_TRUE(ParseStatement(py3, "@ foo").Find<CSingleDecorator>()->GetUsedArgList().empty());
  });
}

TEST(GlobalTest, NamesWithoutTheirCommas) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "global a , b");
    EXPECT_EQ(tree.Find<CGlobalStmt>()->GetUtf8NameList(), (std::vector<Text>{"a", "b"}));
  });
  EXPECT_EQ(Parse3("nonlocal a").Find<CNonlocalStmt>()->GetUtf8NameList(), std::vector<Text>{"a"});
  EXPECT_TRUE(Factory().NewBare<CGlobalStmt>()->GetUtf8NameList().empty());
}

// ---- other statements ----

TEST(IfTest, TheFirstTestIsRead) {
  UnderBoth([](bool py3) {
    EXPECT_EQ(Show(ParseStatement(py3, "if a < b :").Find<CIfStmt>()->GetTestExpression()), "a < b");
  });
  ExpectError(ErrorKind::kTypeError, "Expected CExpression, got CNode",
              [] { Parse3("if ... :").Find<CIfStmt>()->GetTestExpression(); });
}

TEST(ForTest, TheElseOfEightChildrenOnly) {
  Tree tree = Parse3("for a , b in c :");
  auto* node = tree.Find<CForStmt>();
  EXPECT_EQ(Show(node->GetTarget()), "a , b");
  EXPECT_EQ(Show(node->GetInExpression()), "c");
  EXPECT_EQ(node->GetBody(), node->LastChild());
  EXPECT_EQ(node->GetElseBody(), nullptr);
  CNode* x = BareLeaf("x");
  CNode* last = BareLeaf("last");
  EXPECT_EQ(Bare<CForStmt>({x, x, x, x, x, x, x, last})->GetElseBody(), last);
  // A real for-else has nine.
  EXPECT_EQ(Bare<CForStmt>({x, x, x, x, x, x, x, x, last})->GetElseBody(), nullptr);
}

TEST(WithTest, ABareExpressionIsNoWithItem) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "with a , b as c :");
    const NodeList items = tree.Find<CWithStmt>()->GetWithItems();
    ASSERT_EQ(items.size(), 1u);
    EXPECT_EQ(Show(cast<CWithItem>(items[0])->GetExpression()), "b");
    EXPECT_EQ(Show(cast<CWithItem>(items[0])->GetTarget()), "c");
  });
}

TEST(DelTest, AListHasSeveralAnAtomIsOne) {
  UnderBoth([](bool py3) {
    EXPECT_EQ(Show(ParseStatement(py3, "del a , b").Find<CDelStmt>()->GetExpressions()), (Texts{"a", "b"}));
    EXPECT_EQ(Show(ParseStatement(py3, "del a").Find<CDelStmt>()->GetExpressions()), Texts{"a"});
    EXPECT_EQ(Show(ParseStatement(py3, "del ( a , b )").Find<CDelStmt>()->GetExpressions()), Texts{"( a , b )"});
  });
  EXPECT_TRUE(Bare<CDelStmt>({BareLeaf("del")})->GetExpressions().empty());
}

TEST(ExceptTest, TheTargetIsReadFromTheEnd) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "except X as e :");
    EXPECT_EQ(Show(tree.Find<CExceptClause>()->GetExceptionType()), "X");
    EXPECT_EQ(Show(tree.Find<CExceptClause>()->GetTarget()), "e");
    Tree bare = ParseStatement(py3, "except X :");
    EXPECT_EQ(bare.Find<CExceptClause>()->GetTarget(), nullptr);
    EXPECT_EQ(Show(bare.Find<CExceptClause>()->GetExceptionType()), "X");
  });
  EXPECT_EQ(Show(Parse2("except X , e :").Find<CExceptClause>()->GetTarget()), "e");
  CNode* x = BareLeaf("x");
  EXPECT_EQ(Bare<CExceptClause>({x, x, x, x})->GetTarget(), nullptr);
  EXPECT_EQ(Bare<CExceptClause>({x})->GetExceptionType(), nullptr);
}

TEST(ReturnTest, TheValueMayBeAbsent) {
  EXPECT_EQ(Show(Parse3("return a , b").Find<CReturnStmt>()->GetValue()), "a , b");
  EXPECT_EQ(Bare<CReturnStmt>({BareLeaf("return")})->GetValue(), nullptr);
}

TEST(CaseTest, TheGuardGoesByTheCountAlone) {
  CNode* word = BareLeaf("case");
  CNode* pattern = BareLeaf("p");
  CNode* guard = BareLeaf("g");
  CNode* colon = BareLeaf(":");
  CNode* body = BareLeaf("b");
  auto* whole = Bare<CCaseStmt>({word, pattern, guard, colon, body});
  EXPECT_EQ(whole->GetPattern(), pattern);
  EXPECT_EQ(whole->GetGuard(), guard);
  EXPECT_EQ(whole->GetBody(), body);
  auto* head = Bare<CCaseStmt>({word, pattern, colon});
  EXPECT_EQ(head->GetGuard(), nullptr);
  EXPECT_EQ(head->GetBody(), nullptr);
  // The colon of `case p: b` is taken for the guard; callers tolerate it.
  EXPECT_EQ(Bare<CCaseStmt>({word, pattern, colon, body})->GetGuard(), colon);
  EXPECT_EQ(Bare<CCaseStmt>({word, pattern, guard, colon})->GetBody(), nullptr);
}

TEST(MatchTest, TheSubjectMustBeAnExpression) {
  CNode* subject = BareLeaf<CNameLiteral>("x");
  EXPECT_EQ(Bare<CMatchStmt>({BareLeaf("match"), subject})->GetTestExpression(), subject);
  ExpectError(ErrorKind::kTypeError, "Expected CExpression, got CNode", [] {
    Bare<CMatchStmt>({BareLeaf("match"), BareLeaf("...")})->GetTestExpression();
  });
}

TEST(TypeParameterTest, TheNameIsFoundInEveryShape) {
  CNode* star = BareLeaf("*");
  CNode* name = BareLeaf("T");
  CNode* colon = BareLeaf(":");
  CNode* bound = BareLeaf("int");
  struct Row {
    CTypeParameter* node;
    Text prefix;
    CNode* spec;
  };
  for (const Row& row :
       {Row{Bare<CTypeParameter>({name}), kNoText, nullptr}, Row{Bare<CTypeParameter>({star, name}), "*", nullptr},
        Row{Bare<CTypeParameter>({BareLeaf("**"), name}), "**", nullptr},
        Row{Bare<CTypeParameter>({name, colon, bound}), kNoText, bound},
        Row{Bare<CTypeParameter>({star, name, colon, bound}), "*", bound}}) {
    EXPECT_EQ(row.node->GetName(), name) << Show(row.node);
    EXPECT_EQ(row.node->GetPrefix(), row.prefix) << Show(row.node);
    EXPECT_EQ(row.node->GetSpecNode(), row.spec) << Show(row.node);
  }
}

TEST(WithTypeParametersTest, TheStatementComesLast) {
  auto* first = Bare<CTypeParameter>({BareLeaf("T")});
  auto* second = Bare<CTypeParameter>({BareLeaf("U")});
  CNode* statement = BareLeaf("x");
  auto* node = Bare<CWithTypeParameters>({first, second, statement});
  EXPECT_EQ(node->GetTypeParameters(), (NodeList{first, second}));
  EXPECT_EQ(node->TypeParameterSpan().size(), 2u);
  EXPECT_EQ(node->GetTypeParameterScopedStatement(), statement);
}

// ---- parameters ----

Texts ParametersOf(bool py3, const std::string& parameters) {
  static std::vector<std::string> statements;  // the trees view them
  statements.push_back("def f ( " + parameters + " ) :");
  Tree tree = ParseStatement(py3, statements.back());
  return Show(GetDefiningArgInfoList(tree.Find<CFuncdefStmt>()->GetParameters()));
}

TEST(DefiningArgsTest, ParametersUnderBothGrammars) {
  UnderBoth([](bool py3) {
    EXPECT_EQ(ParametersOf(py3, ""), Texts{});
    EXPECT_EQ(ParametersOf(py3, "a"), Texts{"a"});
    EXPECT_EQ(ParametersOf(py3, "a , b = 1"), (Texts{"a", "b=1"}));
    EXPECT_EQ(ParametersOf(py3, "a = ( 1 , 2 ) , * b , ** c"), (Texts{"a=( 1 , 2 )", "*b", "**c"}));
    EXPECT_EQ(ParametersOf(py3, "* b"), Texts{"*b"});
  });
}

TEST(DefiningArgsTest, ABareStarIsARecordWithoutAName) {
  EXPECT_EQ(ParametersOf(true, "a , * , b"), (Texts{"a", "*", "b"}));
}

TEST(DefiningArgsTest, ThePositionMarkerLeavesNoTrace) {
  EXPECT_EQ(ParametersOf(true, "a , / , b"), (Texts{"a", "b"}));
  EXPECT_EQ(ParametersOf(true, "a = 1 , /"), Texts{"a=1"});
}

TEST(DefiningArgsTest, Annotations) {
  EXPECT_EQ(ParametersOf(true, "a : int = 1"), Texts{"a:int=1"});
  EXPECT_EQ(ParametersOf(true, "a : int"), Texts{"a:int"});
  EXPECT_EQ(ParametersOf(true, "* a : int , b : str = 'x' , ** c : d"), (Texts{"*a:int", "b:str='x'", "**c:d"}));
}

TEST(DefiningArgsTest, ATupleParameterIsAListOfItsOwn) {
  EXPECT_EQ(ParametersOf(false, "( a , b ) , c"), (Texts{"[a b]", "c"}));
  EXPECT_EQ(ParametersOf(false, "( a , ( b , c ) )"), Texts{"[a [b c]]"});
  EXPECT_EQ(ParametersOf(false, "( a )"), Texts{"[a]"});
  EXPECT_EQ(ParametersOf(false, "x , ( ( a ) , b ) , y = 2"), (Texts{"x", "[[a] b]", "y=2"}));
}

TEST(DefiningArgsTest, TheDefaultOfATupleParameterIsDropped) {
  EXPECT_EQ(ParametersOf(false, "( a , b ) = x , c"), (Texts{"[a b]", "c"}));
  EXPECT_EQ(ParametersOf(false, "( a , b ) = x"), Texts{"[a b]"});
}

TEST(DefiningArgsTest, LambdaParameters) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "lambda a , b = 1 , * c : 0");
    EXPECT_EQ(Show(GetDefiningArgInfoList(tree.Find<CLambdaExpr>()->GetArgumentsNode())), (Texts{"a", "b=1", "*c"}));
    Tree single = ParseStatement(py3, "lambda a : 0");
    EXPECT_EQ(Show(GetDefiningArgInfoList(single.Find<CLambdaExpr>()->GetArgumentsNode())), Texts{"a"});
  });
}

TEST(DefiningArgsTest, AListIsReused) {
  Tree tree = Parse2("def f ( ( a , b ) , c ) :");
  ArgList list;
  GetDefiningArgInfoList(tree.Find<CFuncdefStmt>()->GetParameters(), list);
  GetDefiningArgInfoList(tree.Find<CFuncdefStmt>()->GetParameters(), list);
  EXPECT_EQ(Show(list), (Texts{"[a b]", "c"}));
}

TEST(DefiningArgsTest, ShapesThatNoGrammarGivesAreAssertionErrors) {
  auto* list = Bare<CDefiningArglistNode>({BareLeaf<CNumberLiteral>("1")});
  ExpectError(ErrorKind::kAssertionError,
              "Text is not ( or ): text = '1', type(child) = <class 'quillet.tarvex.CNumberLiteral'>",
              [&] { GetDefiningArgInfoList(list); });
  auto* interior = Bare<CDefiningArglistNode>({Bare<CAtom>({BareLeaf("x"), BareLeaf("y")})});
  ExpectError(ErrorKind::kAssertionError,
              "Text is not ( or ): text = None, type(child) = <class 'quillet.tarvex.CAtom'>",
              [&] { GetDefiningArgInfoList(interior); });
  ExpectError(ErrorKind::kAssertionError, "(<class 'quillet.tarvex.CNumberLiteral'>: CNumberLiteral, '1')",
              [] { GetDefiningArgInfoList(BareLeaf<CNumberLiteral>("1")); });
  auto* brackets = Bare<CDefiningArglistNode>({BareLeaf("("), BareLeaf<CNameLiteral>("x"), BareLeaf(")")});
  EXPECT_EQ(Show(GetDefiningArgInfoList(brackets)), Texts{"x"});
}

TEST(DefiningArgsTest, TupleParametersNestAsDeepAsTheSourceLikes) {
  CNode* inner = BareLeaf<CNameLiteral>("a");
  CNode* open = BareLeaf("(");
  CNode* close = BareLeaf(")");
  for (int depth = 0; depth < 500'000; ++depth) inner = Bare<CFunctionParameterDef>({open, inner, close});
  const ArgList list = GetDefiningArgInfoList(inner);
  int depth = 0;
  const ArgList* level = &list;
  while (level->size() == 1 && (*level)[0].is_list) {
    level = &(*level)[0].list;
    ++depth;
  }
  EXPECT_EQ(depth, 500'000);
  EXPECT_EQ(Show(*level), Texts{"a"});
}

TEST(FunctionParameterDefTest, ANestedListHasNoName) {
  Tree tree = Parse2("def f ( ( a , b ) ) :");
  auto* nested = tree.Find<CFunctionParameterDef>();
  EXPECT_EQ(Show(nested->GetNestedListNode()), "a , b");
  EXPECT_EQ(nested->GetName(), nullptr);
  EXPECT_EQ(nested->GetTypeExpr(), nullptr);
  Tree typed = Parse3("def f ( a : int ) :");
  EXPECT_EQ(typed.Find<CFunctionParameterDef>()->GetNestedListNode(), nullptr);
  EXPECT_EQ(Show(typed.Find<CFunctionParameterDef>()->GetName()), "a");
  EXPECT_EQ(Show(typed.Find<CFunctionParameterDef>()->GetTypeExpr()), "int");
}

// ---- arguments ----

Texts ArgumentsOf(bool py3, const std::string& arguments) {
  static std::vector<std::string> statements;
  statements.push_back("f ( " + arguments + " )");
  Tree tree = ParseStatement(py3, statements.back());
  return Show(GetUsedArgInfoList(tree.Find<CTrailer>()->GetNestedNode()));
}

TEST(UsedArgsTest, ArgumentsUnderBothGrammars) {
  UnderBoth([](bool py3) {
    EXPECT_EQ(ArgumentsOf(py3, "a"), Texts{"=a"});
    EXPECT_EQ(ArgumentsOf(py3, "a , b"), (Texts{"=a", "=b"}));
    EXPECT_EQ(ArgumentsOf(py3, "a , k = v"), (Texts{"=a", "k=v"}));
    EXPECT_EQ(ArgumentsOf(py3, "k = v"), Texts{"k=v"});
  });
}

TEST(UsedArgsTest, ATrailingCommaAddsNothing) { EXPECT_EQ(ArgumentsOf(true, "a , b ,"), (Texts{"=a", "=b"})); }

TEST(UsedArgsTest, AStarredArgumentIsItsOwnValueUnderTheNewerGrammar) {
  EXPECT_EQ(ArgumentsOf(true, "x = 1 , * y"), (Texts{"x=1", "*=* y"}));
  EXPECT_EQ(ArgumentsOf(true, "a , ** k"), (Texts{"=a", "**=** k"}));
}

TEST(UsedArgsTest, AStarIsALeafOfTheListUnderTheOlderGrammar) {
  EXPECT_EQ(ArgumentsOf(false, "x = 1 , * y , ** z"), (Texts{"x=1", "*=y", "**=z"}));
  EXPECT_EQ(ArgumentsOf(false, "* y"), Texts{"*=y"});
}

TEST(UsedArgsTest, ALoneStarredArgumentHasNoPrefix) {
  Tree tree = Parse3("f ( * a )");
  const UsedArgList list = GetUsedArgInfoList(tree.Find<CTrailer>()->GetNestedNode());
  ASSERT_EQ(list.size(), 1u);
  EXPECT_TRUE(IsNone(list[0].prefix));
  EXPECT_EQ(list[0].name, nullptr);
  EXPECT_EQ(list[0].value, tree.Find<CSingleUsedArgumentNode>());
}

TEST(UsedArgsTest, ACommaAppendsWhateverTheRecordHolds) {
  auto* list = Bare<CUsedArglistNode>({BareLeaf(","), BareLeaf("*"), BareLeaf(","), BareLeaf("a")});
  EXPECT_EQ(Show(GetUsedArgInfoList(list)), (Texts{"", "*", "=a"}));
  ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fText'",
              [] { GetUsedArgInfoList(Bare<CUsedArglistNode>({nullptr})); });
}

TEST(UsedArgsTest, AListIsReused) {
  Tree tree = Parse3("f ( a , b )");
  UsedArgList list(5);
  GetUsedArgInfoList(tree.Find<CTrailer>()->GetNestedNode(), list);
  EXPECT_EQ(Show(list), (Texts{"=a", "=b"}));
}

TEST(SingleUsedArgumentTest, AGeneratorExpressionWithoutParenthesesIsItsOwnValue) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "f ( i for i in x )");
    auto* node = tree.Find<CSingleUsedArgumentNode>();
    ASSERT_NE(node, nullptr);
    EXPECT_TRUE(node->IsUnparenthesizedGenExpr());
    EXPECT_EQ(node->GetValue(), node);
    EXPECT_EQ(node->GetName(), nullptr);
    EXPECT_TRUE(IsNone(node->GetPrefix()));
    EXPECT_EQ(ParseStatement(py3, "f ( ( i for i in x ) )").Find<CSingleUsedArgumentNode>(), nullptr);
  });
}

TEST(SingleUsedArgumentTest, ANamedExpressionIsReadByItsOwnAccessors) {
  Tree tree = Parse3("f ( a := 1 , b )");
  auto* node = tree.Find<CSingleUsedArgumentNode>();
  EXPECT_EQ(Show(node->GetNameAssigned()), "a");
  EXPECT_EQ(Show(node->GetNamedRightHandExpression()), "1");
  EXPECT_EQ(node->GetName(), nullptr);
  EXPECT_EQ(node->GetValue(), node);
  Tree keyword = Parse3("f ( a = 1 )");
  EXPECT_EQ(keyword.Find<CSingleUsedArgumentNode>()->GetNameAssigned(), nullptr);
  EXPECT_EQ(keyword.Find<CSingleUsedArgumentNode>()->GetNamedRightHandExpression(), nullptr);
}

TEST(TokenEndIndexTest, OnePastTheLastLeaf) {
  Tree tree = Parse3("x = f ( a , b )");
  EXPECT_EQ(GetTokenEndIndex(tree.root()), 8);
  EXPECT_EQ(GetTokenEndIndex(tree.Find<CNameLiteral>()), 1);
  ExpectError(ErrorKind::kTypeError, "unsupported operand type(s) for +: 'NoneType' and 'int'",
              [] { GetTokenEndIndex(BareLeaf("x")); });
}

// ---- imports ----

Texts Show(const std::vector<CAsName>& names) {
  Texts texts;
  for (const CAsName& name : names) texts.push_back(name.module_name + (name.has_as_name ? " as " + name.as_name : ""));
  return texts;
}

TEST(ImportNamesTest, Names) {
  UnderBoth([](bool py3) {
    auto names = [&](Text statement) {
      return Show(ParseStatement(py3, statement).Find<CImportNamesStmt>()->GetAsNameList());
    };
    EXPECT_EQ(names("import a"), Texts{"a"});
    EXPECT_EQ(names("import a . b"), Texts{"a.b"});
    EXPECT_EQ(names("import a as b"), Texts{"a as b"});
    EXPECT_EQ(names("import a . b as c , d"), (Texts{"a.b as c", "d"}));
    EXPECT_EQ(names("import a , b . c"), (Texts{"a", "b.c"}));
  });
}

TEST(FromImportTest, FromNames) {
  UnderBoth([](bool py3) {
    auto from = [&](Text statement) { return ParseStatement(py3, statement).Find<CFromImportStmt>()->GetFromString(); };
    EXPECT_EQ(from("from a import b"), "a");
    EXPECT_EQ(from("from a . b import c"), "a.b");
    EXPECT_EQ(from("from . import c"), ".");
    EXPECT_EQ(from("from . . a . b import c"), "..a.b");
  });
  EXPECT_EQ(Parse3("from ... a import c").Find<CFromImportStmt>()->GetFromString(), "...a");
}

TEST(FromImportTest, ImportedNames) {
  UnderBoth([](bool py3) {
    auto names = [&](Text statement) {
      return Show(ParseStatement(py3, statement).Find<CFromImportStmt>()->GetAsNameList());
    };
    EXPECT_EQ(names("from x import a"), Texts{"a"});
    EXPECT_EQ(names("from x import a as b"), Texts{"a as b"});
    EXPECT_EQ(names("from x import a , b as c"), (Texts{"a", "b as c"}));
    EXPECT_EQ(names("from . import ( a , b )"), (Texts{"a", "b"}));
    EXPECT_EQ(names("from . import ( a )"), Texts{"a"});
    EXPECT_EQ(names("from x import *"), Texts{"*"});
  });
}

TEST(FromImportTest, TheStar) {
  EXPECT_TRUE(Parse3("from x import *").Find<CFromImportStmt>()->GetImportStar());
  EXPECT_FALSE(Parse3("from x import a").Find<CFromImportStmt>()->GetImportStar());
  EXPECT_FALSE(Bare<CFromImportStmt>({BareLeaf("from"), BareLeaf("*")})->GetImportStar());
  EXPECT_TRUE(Bare<CFromImportStmt>({BareLeaf("from"), BareLeaf("import"), BareLeaf("*")})->GetImportStar());
}

TEST(FromImportTest, WithoutAnImportChildThereIsNoFromText) {
  auto* node = Bare<CFromImportStmt>({BareLeaf("from"), BareLeaf("x")});
  EXPECT_EQ(node->GetImportIndex(), -1);
  EXPECT_FALSE(node->HasFromString());
  EXPECT_TRUE(node->FromNodes().empty());
  EXPECT_FALSE(Bare<CFromImportStmt>({BareLeaf("from"), BareLeaf("import")})->HasFromString());
}

TEST(ImportNamesTest, ATokenIsFoundByItsText) {
  Tree tree = Parse3("from x import a");
  EXPECT_EQ(GetMatchingChildToken(tree.root(), "import"), 2);
  EXPECT_EQ(GetMatchingChildToken(tree.root(), "as"), -1);
  EXPECT_EQ(GetMatchingChildToken(BareLeaf("x"), "x"), -1);
}

TEST(ImportNamesTest, TextIsJoinedThroughAnyDepth) {
  CNode* node = BareLeaf("a");
  for (int depth = 0; depth < 200'000; ++depth) node = Bare<CNode>({node, BareLeaf(".")});
  CNode* empty = Factory().NewBare<CNode>();
  const NodeList nodes{BareLeaf("x"), empty, node};
  EXPECT_EQ(TextForImportName(nodes), "xa" + std::string(200'000, '.'));
}

// ---- numbers and strings ----

TEST(NumberTest, AnyEMakesAFloat) {
  for (Text text : {"1.5", "1e5", ".5", "1E5", "0xe", "0xE1"}) EXPECT_TRUE(BareLeaf<CNumberLiteral>(text)->IsFloat());
  for (Text text : {"10", "1_000", "0x10", "1j", "0777L"}) EXPECT_FALSE(BareLeaf<CNumberLiteral>(text)->IsFloat());
}

TEST(StringTest, OnlyALeadingRIsSkippedForThePrefix) {
  auto is_bytes = [](Text text) { return BareLeaf<CStringLiteral>(text)->IsBytes(); };
  auto is_unicode = [](Text text) { return BareLeaf<CStringLiteral>(text)->IsUnicode(); };
  for (Text text : {"b''", "B''", "rb''", "Rb''", "br''"}) EXPECT_TRUE(is_bytes(text)) << text;
  for (Text text : {"u''", "U''", "ur''", "Ur''"}) EXPECT_TRUE(is_unicode(text)) << text;
  for (Text text : {"''", "r''", "f''", "rrb''", "'b'", ""}) {
    EXPECT_FALSE(is_bytes(text)) << text;
    EXPECT_FALSE(is_unicode(text)) << text;
  }
  ExpectError(ErrorKind::kIndexError, "string index out of range", [&] { is_bytes("r"); });
}

TEST(StringTest, Contents) {
  struct Row {
    Text token, contents;
  };
  for (const Row& row : {Row{"''", ""}, Row{"\"\"\"\"\"\"", ""}, Row{"'a'", "a"}, Row{"rb\"\"\"x\"\"\"", "x"},
                         Row{"'abc", "abc"}, Row{"'''a'b'''", "a'b"}, Row{"'\\n'", "\\n"}, Row{"'''abc", "abc"},
                         Row{"''a", ""}, Row{"'", ""}, Row{"'''", ""}, Row{"'''''", ""}, Row{"\"'\"", "'"},
                         Row{"fRb'x'", "x"}, Row{"x'y'", ""}, Row{"'\xc3\xa9'", "\xc3\xa9"}}) {
    const Text contents = BareLeaf<CStringLiteral>(row.token)->GetStringContents();
    EXPECT_EQ(contents, row.contents) << row.token;
    EXPECT_FALSE(IsNone(contents)) << row.token;
  }
  ExpectError(ErrorKind::kIndexError, "string index out of range",
              [] { BareLeaf<CStringLiteral>("rb")->GetStringContents(); });
}

TEST(StringTest, AnFAmongThePrefixLettersMakesAFormattedLiteral) {
  for (Text text : {"f'x'", "rf'x'", "Fr'x'", "bF''"}) EXPECT_TRUE(BareLeaf<CStringLiteral>(text)->IsFormatted());
  for (Text text : {"'f'", "r'x'", "b'f'", ""}) EXPECT_FALSE(BareLeaf<CStringLiteral>(text)->IsFormatted());
}

TEST(StringTest, ALeafWithoutTextIsATypeError) {
  ExpectError(ErrorKind::kTypeError, "object of type 'NoneType' has no len()",
              [] { Factory().NewBare<CStringLiteral>()->IsBytes(); });
}

// ---- atoms ----

TEST(AtomTest, CountsOfSubExpressions) {
  UnderBoth([](bool py3) {
    auto count = [&](Text statement) { return ParseStatement(py3, statement).Find<CAtom>()->GetSubExprCount(); };
    EXPECT_EQ(count("[ ]"), 0);
    EXPECT_EQ(count("[ x ]"), 1);
    EXPECT_EQ(count("( x )"), 0);
    EXPECT_EQ(count("( )"), 0);
    EXPECT_EQ(count("( x , y )"), 2);
    EXPECT_EQ(count("( x , )"), 1);
    EXPECT_EQ(count("[ x , y , z ]"), 3);
    EXPECT_EQ(count("{ 1 , 2 }"), 0);
    EXPECT_EQ(count("[ i for i in x ]"), 0);
    EXPECT_EQ(count("( i for i in x )"), 0);
    EXPECT_EQ(count("( ( x , y ) )"), 2);
    EXPECT_EQ(count("( [ x ] )"), 1);
    EXPECT_EQ(count("[ ( x ) ]"), 1);
    EXPECT_EQ(count("[ { 1 , 2 } ]"), 1);
  });
}

TEST(AtomTest, AListOfOneTupleReportsTheElementsOfTheTuple) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "[ ( 1 , 2 ) ]");
    auto* node = tree.Find<CAtom>();
    EXPECT_EQ(node->GetSubExprCount(), 2);
    EXPECT_EQ(Show(node->GetSubExpr(1)), "2");
  });
}

TEST(AtomTest, SubExpressions) {
  UnderBoth([](bool py3) {
    auto show = [&](Text statement, int32_t index) {
      return Show(ParseStatement(py3, statement).Find<CAtom>()->GetSubExpr(index));
    };
    EXPECT_EQ(show("[ x ]", 0), "x");
    EXPECT_EQ(show("[ x ]", 1), "None");
    EXPECT_EQ(show("( x , y )", 1), "y");
    EXPECT_EQ(show("( x )", 0), "None");
    EXPECT_EQ(show("[ ]", 0), "None");
    EXPECT_EQ(show("[ ( x ) ]", 0), "( x )");
    EXPECT_EQ(show("( [ ( x ) ] )", 0), "( x )");
    EXPECT_EQ(show("[ [ x ] ]", 0), "x");
    EXPECT_EQ(show("[ x , y ]", 0), "x");
    EXPECT_EQ(Show(static_cast<CExpression*>(ParseStatement(py3, "[ x ]").Find<CAtom>())->GetSubExpr(0)), "x");
  });
  EXPECT_EQ(Show(Parse2("[ x , y ]").Find<CAtom>()->GetSubExpr(2)), "None");
  ExpectError(ErrorKind::kValueError, "Not enough expressions in list",
              [] { Parse3("[ x , y ]").Find<CAtom>()->GetSubExpr(2); });
}

TEST(AtomTest, AnInsideThatIsNoExpressionCountsForNothing) {
  auto* atom = Bare<CAtom>({BareLeaf("["), Bare<CNode>({BareLeaf("x"), BareLeaf("y")}), BareLeaf("]")});
  EXPECT_EQ(atom->GetSubExprCount(), 0);
  EXPECT_EQ(atom->GetSubExpr(0), nullptr);
  // The display around it has that display as its one element.
  auto* around = Bare<CAtom>({BareLeaf("["), atom, BareLeaf("]")});
  EXPECT_EQ(around->GetSubExprCount(), 1);
  EXPECT_EQ(around->GetSubExpr(0), atom);
}

TEST(AtomTest, BracketsNestAsDeepAsTheSourceLikes) {
  CNode* inner = BareLeaf<CNameLiteral>("x");
  for (int depth = 0; depth < 500'000; ++depth) inner = Bare<CAtom>({BareLeaf("("), inner, BareLeaf(")")});
  auto* atom = cast<CAtom>(inner);
  EXPECT_EQ(atom->GetSubExprCount(), 0);
  EXPECT_EQ(atom->GetSubExpr(0), nullptr);
  EXPECT_EQ(Show(DropSimpleParens(atom)), "x");
  EXPECT_FALSE(IsTupleLiteralNode(atom));
}

TEST(AtomTest, TheInitialBracket) {
  EXPECT_EQ(Parse3("( x )").Find<CAtom>()->GetInitialBracket(), "(");
  EXPECT_EQ(Parse3("[ x ]").Find<CAtom>()->GetInitialBracket(), "[");
  EXPECT_EQ(Parse3("{ x }").Find<CAtom>()->GetInitialBracket(), "{");
  EXPECT_TRUE(IsNone(Parse3("'a' 'b'").Find<CAtom>()->GetInitialBracket()));
  EXPECT_TRUE(IsNone(Parse2("` a `").Find<CAtom>()->GetInitialBracket()));
  ExpectError(ErrorKind::kValueError, "Atom node with no children",
              [] { Factory().NewBare<CAtom>()->GetInitialBracket(); });
}

TEST(AtomTest, StringsSideBySideAreALiteral) {
  UnderBoth([](bool py3) {
    Tree tree = ParseStatement(py3, "'a' 'b'");
    EXPECT_TRUE(tree.Find<CAtom>()->IsTwoPlusStringLiterals());
    EXPECT_TRUE(tree.Find<CAtom>()->IsLiteral());
    EXPECT_FALSE(ParseStatement(py3, "( 'a' )").Find<CAtom>()->IsTwoPlusStringLiterals());
  });
  EXPECT_FALSE(Factory().NewBare<CAtom>()->IsTwoPlusStringLiterals());
}

TEST(AtomTest, EveryBracketsComprehensionIsOne) {
  UnderBoth([](bool py3) {
    for (Text statement : {"[ i for i in x ]", "( i for i in x )", "{ i for i in x }", "{ i : i for i in x }"}) {
      Tree tree = ParseStatement(py3, statement);
      EXPECT_TRUE(tree.Find<CAtom>()->IsComprehension()) << statement;
      EXPECT_FALSE(tree.Find<CAtom>()->IsLiteral()) << statement;
    }
    for (Text statement : {"[ ]", "[ x ]", "( x , y )", "{ 1 : 2 }", "{ 1 : 2 , 3 : 4 }"}) {
      EXPECT_FALSE(ParseStatement(py3, statement).Find<CAtom>()->IsComprehension()) << statement;
    }
  });
}

TEST(LiteralTest, SetLiterals) {
  UnderBoth([](bool py3) {
    auto is_set = [&](Text statement) { return IsSetLiteral(ParseStatement(py3, statement).Find<CAtom>()); };
    EXPECT_TRUE(is_set("{ 1 , 2 }"));
    EXPECT_TRUE(is_set("{ 1 }"));
    EXPECT_TRUE(is_set("{ i for i in x }"));
    EXPECT_FALSE(is_set("{ 1 : 2 }"));
    EXPECT_FALSE(is_set("{ i : i for i in x }"));
    EXPECT_FALSE(is_set("{ }"));
    EXPECT_FALSE(is_set("[ 1 ]"));
  });
}

TEST(LiteralTest, AGeneratorExpressionsClauseIsNotTheWordFor) {
  EXPECT_FALSE(IsGenExpression(Parse3("( i for i in x )").Find<CAtom>()));
  auto* words = Bare<CNode>({BareLeaf("i"), BareLeaf("for")});
  EXPECT_TRUE(IsGenExpression(Bare<CAtom>({BareLeaf("("), words, BareLeaf(")")})));
  EXPECT_FALSE(IsGenExpression(Bare<CAtom>({BareLeaf("["), words, BareLeaf("]")})));
  EXPECT_FALSE(IsGenExpression(Bare<CAtom>({BareLeaf("("), BareLeaf("for"), BareLeaf(")")})));
  EXPECT_FALSE(IsGenExpression(Bare<CAtom>({BareLeaf("("), BareLeaf(")")})));
}

TEST(LiteralTest, TupleLiterals) {
  UnderBoth([](bool py3) {
    auto is_tuple = [&](Text statement) { return IsTupleLiteralNode(ParseStatement(py3, statement).root()); };
    EXPECT_TRUE(is_tuple("( )"));
    EXPECT_TRUE(is_tuple("( x , )"));
    EXPECT_TRUE(is_tuple("( ( a , b ) )"));
    EXPECT_TRUE(is_tuple("a , b"));
    EXPECT_FALSE(is_tuple("( x )"));
    EXPECT_FALSE(is_tuple("[ a , b ]"));
    EXPECT_FALSE(is_tuple("( i for i in x )"));
    EXPECT_FALSE(is_tuple("x"));
  });
  CNode* x = BareLeaf("x");
  ExpectError(ErrorKind::kAssertionError, "", [&] { IsTupleLiteralNode(Bare<CAtom>({BareLeaf("("), x, x, x})); });
  EXPECT_FALSE(IsTupleLiteralNode(nullptr));
  EXPECT_FALSE(IsTupleLiteralNode(Factory().NewBare<CTestListStarExpr>()));
}

TEST(LiteralTest, SimpleParenthesesAreDropped) {
  UnderBoth([](bool py3) {
    auto dropped = [&](Text statement) { return Show(DropSimpleParens(ParseStatement(py3, statement).root())); };
    EXPECT_EQ(dropped("( ( 1 ) )"), "1");
    EXPECT_EQ(dropped("( ( 1 , 2 ) )"), "( 1 , 2 )");
    EXPECT_EQ(dropped("( ( i for i in x ) )"), "( i for i in x )");
    EXPECT_EQ(dropped("( a + b )"), "a + b");
    EXPECT_EQ(dropped("[ a ]"), "[ a ]");
    EXPECT_EQ(dropped("( )"), "( )");
    EXPECT_EQ(dropped("x"), "x");
  });
  EXPECT_EQ(DropSimpleParens(nullptr), nullptr);
}

TEST(LiteralTest, OnlyParenthesisedTuplesExpand) {
  UnderBoth([](bool py3) {
    auto expanded = [&](Text statement) {
      Tree tree = ParseStatement(py3, statement);
      NodeList elements{tree.root()};
      return ExpandSeqLiteral(tree.root(), elements) ? Show(elements) : Texts{"None"};
    };
    EXPECT_EQ(expanded("( )"), Texts{});
    EXPECT_EQ(expanded("( ( 1 , 2 ) )"), (Texts{"1", "2"}));
    EXPECT_EQ(expanded("( 1 , )"), Texts{"1"});
    EXPECT_EQ(expanded("1"), Texts{"None"});
    EXPECT_EQ(expanded("[ 1 ]"), Texts{"None"});
    // A lone element that is no simple test: the clause of a generator expression has no elements.
    EXPECT_EQ(expanded("( i for i in x )"), Texts{});
  });
}

}  // namespace
}  // namespace quillet
