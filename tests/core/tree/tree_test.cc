// Nodes, their pool and the factory, on trees built by hand over a made-up list of states: a state
// for each token number, then one for each node class.
#include <gtest/gtest.h>

#include <algorithm>
#include <initializer_list>
#include <set>
#include <string>
#include <unordered_map>
#include <vector>

#include "foundations/console.h"
#include "tests/core/support/expect_error.h"
#include "tree/factory.h"
#include "tree/nodes.h"

namespace quillet {
namespace {

using test::ExpectError;

constexpr int32_t kFirstSymbol = 256;

int32_t StateOf(NodeKind kind) { return kFirstSymbol + static_cast<int32_t>(kind); }

std::vector<CNodeFactory::State> States() {
  std::vector<CNodeFactory::State> states(kFirstSymbol, {NodeKind::kCNode, kNoText});
  states[tok::NAME] = {NodeKind::kCNameLiteral, "NAME"};
  states[tok::NUMBER] = {NodeKind::kCNumberLiteral, "NUMBER"};
  states[tok::STRING] = {NodeKind::kCStringLiteral, "STRING"};
  states[tok::NEWLINE] = {NodeKind::kCNode, "NEWLINE"};
  for (int kind = 0; kind < kNodeKindCount; ++kind) {
    states.push_back({static_cast<NodeKind>(kind), NameOfNodeKind(static_cast<NodeKind>(kind))});
  }
  return states;
}

KeywordSet Keywords(std::initializer_list<Text> words) {
  KeywordSet set;
  for (Text keyword : words) set.Add(keyword);
  return set;
}

std::vector<std::string>& PrintedLines() {
  static std::vector<std::string> lines;
  return lines;
}

class TreeTest : public testing::Test {
 protected:
  TreeTest()
      : pool_(new NodePool),
        factory_(pool_, States(), Keywords({"if", "for", "await", "async", "unless"}), {{"+", tok::PLUS}}),
        print_line_(TheConsole().print_line) {
    PrintedLines().clear();
    TheConsole().print_line = [](Text line) { PrintedLines().emplace_back(line); };
  }
  ~TreeTest() override { TheConsole().print_line = print_line_; }

  CNode* Leaf(int32_t state, Text text) {
    return factory_.NewNode(factory_.class_info(state), text, Context::Index(0), nullptr, 0);
  }
  CNode* Name(Text text) { return Leaf(tok::NAME, text); }
  CNode* Rule(NodeKind kind, std::initializer_list<CNode*> children) {
    CNode* node = factory_.NewNode(factory_.class_info(StateOf(kind)), kNoText, Context::None(), nullptr, 0);
    factory_.SetChildren(node, children);
    return node;
  }
  // A chain of nodes of a class, each the only child of the one around it; the root comes first.
  std::vector<CNode*> Chain(NodeKind kind, size_t length) {
    std::vector<CNode*> chain(length);
    CNode* inner = nullptr;
    for (size_t i = length; i-- > 0;) {
      chain[i] = factory_.NewNode(factory_.class_info(StateOf(kind)), kNoText, Context::Index(static_cast<int32_t>(i)),
                                  &inner, inner == nullptr ? 0 : 1);
      inner = chain[i];
    }
    return chain;
  }
  size_t FreeListLength(NodeKind kind) {
    size_t length = 0;
    for (CNode* node = factory_.class_info(StateOf(kind))->fFirstFree; node != nullptr; node = node->fNextFree)
      ++length;
    return length;
  }

  Ref<NodePool> pool_;
  CNodeFactory factory_;
  void (*print_line_)(Text);
};

// ---- kinds ----

TEST(NodeKindTest, TheNamesAndBasesAreThoseOfTheClassTree) {
  EXPECT_STREQ(NameOfNodeKind(NodeKind::kCNode), "CNode");
  EXPECT_STREQ(NameOfNodeKind(NodeKind::kCTypeParameter), "CTypeParameter");
  EXPECT_EQ(BaseOfNodeKind(NodeKind::kCNode), NodeKind::kCNode);
  EXPECT_EQ(BaseOfNodeKind(NodeKind::kCAtom), NodeKind::kCExpression);
  EXPECT_EQ(BaseOfNodeKind(NodeKind::kCExprStmt), NodeKind::kCStmt);
  EXPECT_EQ(BaseOfNodeKind(NodeKind::kCMappingPatternNode), NodeKind::kCPatternNode);
  EXPECT_EQ(BaseOfNodeKind(NodeKind::kCExpression), NodeKind::kCNode);
}

TEST(NodeKindTest, ImportsWithItemsAndExceptClausesAreNoStatements) {
  for (NodeKind kind :
       {NodeKind::kCImportNamesStmt, NodeKind::kCFromImportStmt, NodeKind::kCWithItem, NodeKind::kCExceptClause}) {
    EXPECT_FALSE(IsKind<CStmt>(kind)) << NameOfNodeKind(kind);
    EXPECT_EQ(BaseOfNodeKind(kind), NodeKind::kCNode) << NameOfNodeKind(kind);
  }
}

TEST(NodeKindTest, ClausesAndTrailersAreNoExpressions) {
  for (NodeKind kind :
       {NodeKind::kCYieldArg, NodeKind::kCCompForNode, NodeKind::kCListmakerNode, NodeKind::kCTrailer}) {
    EXPECT_FALSE(IsKind<CExpression>(kind)) << NameOfNodeKind(kind);
  }
}

TEST(NodeKindTest, KeywordAndNameLeavesAreExpressions) {
  EXPECT_TRUE(IsKind<CExpression>(NodeKind::kCKeywordLiteral));
  EXPECT_TRUE(IsKind<CExpression>(NodeKind::kCNameLiteral));
  EXPECT_FALSE(IsKind<CExpression>(NodeKind::kCStmt));
  EXPECT_TRUE(IsKind<CExpression>(NodeKind::kCExpression));
}

TEST(NodeKindTest, IsANullIsFalse) {
  EXPECT_FALSE(isa<CNode>(static_cast<CNode*>(nullptr)));
  EXPECT_EQ(dyn_cast<CAtom>(static_cast<CNode*>(nullptr)), nullptr);
}

TEST(NodeKindTest, ClassesWithRulesHaveNoSubclasses) {
#define QUILLET_NODE_RULE(name, rule) \
  EXPECT_EQ(NodeKindRange<name>::kFirst, NodeKindRange<name>::kLast) << #name << " serves " << rule;
#include "tree/node_kinds.def"
}

// ---- reading children ----

TEST_F(TreeTest, ALeafHasNoChildren) {
  CNode* leaf = Name("x");
  EXPECT_EQ(leaf->GetChildCount(), 0);
  EXPECT_TRUE(IsNone(leaf->GetChildText(0)));
  EXPECT_EQ(leaf->GetChild(0), nullptr);
  EXPECT_EQ(leaf->GetChild(-1), nullptr);
  EXPECT_TRUE(IsNone(leaf->GetChildText(-1)));
  EXPECT_FALSE(leaf->has_children);
}

TEST_F(TreeTest, AnIndexAtTheChildCountGivesNone) {
  CNode* node = Rule(NodeKind::kCDottedName, {Name("a"), Name("b")});
  EXPECT_EQ(node->GetChild(2), nullptr);
  EXPECT_TRUE(IsNone(node->GetChildText(2)));
  EXPECT_EQ(node->GetChild(INT64_MAX), nullptr);
}

TEST_F(TreeTest, ANegativeIndexCountsFromTheEnd) {
  CNode* last = Name("b");
  CNode* node = Rule(NodeKind::kCDottedName, {Name("a"), last});
  EXPECT_EQ(node->GetChild(-1), last);
  EXPECT_EQ(node->GetChildText(-2), "a");
  ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { node->GetChild(-3); });
  ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { node->GetChildText(INT64_MIN); });
}

TEST_F(TreeTest, TheLastChildOfAnEmptyListIsAnIndexError) {
  CNode* node = Rule(NodeKind::kCDottedName, {});
  EXPECT_TRUE(node->has_children);
  ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { node->GetChild(-1); });
}

TEST_F(TreeTest, AFixedPlaceFailsAsTheHostsListsDo) {
  CNode* node = Rule(NodeKind::kCDottedName, {Name("a")});
  EXPECT_EQ(node->ChildAt(0)->fText(), "a");
  ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { node->ChildAt(1); });
  ExpectError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable", [&] { Name("x")->ChildAt(0); });
}

TEST_F(TreeTest, TheTextOfAnInteriorChildIsNone) {
  CNode* node = Rule(NodeKind::kCExprStmt, {Rule(NodeKind::kCDottedName, {Name("a"), Name("b")}), Name("c")});
  EXPECT_TRUE(IsNone(node->GetChildText(0)));
  EXPECT_EQ(node->GetChildText(1), "c");
}

TEST_F(TreeTest, OnlyDirectChildrenMatchAText) {
  CNode* node = Rule(NodeKind::kCExprStmt, {Rule(NodeKind::kCDottedName, {Name("x"), Name("b")}), Name("c")});
  EXPECT_FALSE(node->DoesChildTextMatch("x"));
  EXPECT_TRUE(node->DoesChildTextMatch("c"));
  EXPECT_FALSE(Name("x")->DoesChildTextMatch("x"));
}

TEST_F(TreeTest, ReadingTheTextOfAnAbsentChildIsAnAttributeError) {
  CNode* node = Rule(NodeKind::kCExprStmt, {nullptr, Name("c")});
  const std::string message = "'NoneType' object has no attribute 'fText'";
  ExpectError(ErrorKind::kAttributeError, message, [&] { node->GetChildText(0); });
  ExpectError(ErrorKind::kAttributeError, message, [&] { node->DoesChildTextMatch("c"); });
  ExpectError(ErrorKind::kAttributeError, message, [&] { node->HasChildWithCode(tok::COMMA); });
  EXPECT_EQ(node->GetChild(0), nullptr);
}

TEST_F(TreeTest, ANodeWithoutARecordIsNamedAfterItsClass) {
  CNode* node = factory_.NewBare<CNode>();
  EXPECT_EQ(node->GetStateName(), "CNode");
  EXPECT_EQ(ReprOfNode(node), "<class 'quillet.tarvex.CNode'>: CNode");
  EXPECT_EQ(factory_.NewBare<CMatchStmt>()->GetStateName(), "CMatchStmt");
}

TEST_F(TreeTest, ANodeWithARecordIsNamedAfterItsState) {
  EXPECT_EQ(Name("x")->GetStateName(), "NAME");
  EXPECT_EQ(factory_.NewKeywordNode("if", Context::None())->GetStateName(), "KEYWORD");
  EXPECT_TRUE(IsNone(Leaf(tok::COMMA, ",")->GetStateName()));
  EXPECT_EQ(ReprOfNode(Leaf(tok::COMMA, ",")), "<class 'quillet.tarvex.CNode'>: None");
}

// ---- making nodes ----

TEST_F(TreeTest, AKeywordBecomesAKeywordLeafAndAnyOtherWordAName) {
  CNode* keyword = factory_.ConvertSingleNode(tok::NAME, "if", Context::Index(3), nullptr, 0);
  EXPECT_EQ(keyword->kind, NodeKind::kCKeywordLiteral);
  EXPECT_EQ(keyword->code, word::kIf);
  EXPECT_EQ(keyword->fContext, Context::Index(3));
  CNode* name = factory_.ConvertSingleNode(tok::NAME, "x", Context::Index(4), nullptr, 0);
  EXPECT_EQ(name->kind, NodeKind::kCNameLiteral);
  EXPECT_EQ(name->code, tok::NAME);
  // A word that the tokeniser knows, but no keyword of this factory.
  EXPECT_EQ(factory_.ConvertSingleNode(tok::NAME, "print", Context::None(), nullptr, 0)->kind, NodeKind::kCNameLiteral);
  // A keyword of the host's that the tokeniser does not know.
  EXPECT_EQ(factory_.ConvertSingleNode(tok::NAME, "unless", Context::None(), nullptr, 0)->kind,
            NodeKind::kCKeywordLiteral);
}

TEST_F(TreeTest, ATokenAndItsTextGiveTheSameNode) {
  for (Text text : {"if", "x", "unless", "print", "12", "'s'", "+", "->"}) {
    const Token token{text.data(), static_cast<uint32_t>(text.size()), CodeOfText(text)};
    CNode* fast = factory_.ConvertToken(TypeOfCode(token.code), token, 7);
    CNode* slow = factory_.ConvertSingleNode(TypeOfCode(token.code), text, Context::Index(7), nullptr, 0);
    EXPECT_EQ(fast->fClsInfo, slow->fClsInfo) << text;
    EXPECT_EQ(fast->kind, slow->kind) << text;
    EXPECT_EQ(fast->code, slow->code) << text;
    EXPECT_EQ(fast->fText(), slow->fText());
    EXPECT_EQ(fast->fContext, slow->fContext);
  }
}

TEST_F(TreeTest, TheHostsOwnKeywordsAreAskedEachTime) {
  bool answer = false;
  KeywordSet keywords;
  keywords.enabled = true;
  keywords.host_lookup = [&](Text) { return answer; };
  CNodeFactory factory(pool_, States(), keywords, {});
  EXPECT_EQ(factory.ConvertSingleNode(tok::NAME, "x", Context::None(), nullptr, 0)->kind, NodeKind::kCNameLiteral);
  answer = true;
  EXPECT_EQ(factory.ConvertSingleNode(tok::NAME, "x", Context::None(), nullptr, 0)->kind, NodeKind::kCKeywordLiteral);
}

TEST_F(TreeTest, WithoutKeywordsEveryWordIsAName) {
  CNodeFactory factory(pool_, States(), KeywordSet(), {});
  EXPECT_EQ(factory.ConvertSingleNode(tok::NAME, "if", Context::None(), nullptr, 0)->kind, NodeKind::kCNameLiteral);
  EXPECT_EQ(factory.keyword_class_info(), nullptr);
}

TEST_F(TreeTest, AwaitAndAsyncNeedTheKeywordRecord) {
  CNode* await = factory_.ConvertSingleNode(tok::AWAIT, "anything", Context::None(), nullptr, 0);
  EXPECT_EQ(await->kind, NodeKind::kCKeywordLiteral);
  EXPECT_EQ(factory_.ConvertSingleNode(tok::ASYNC, "async", Context::None(), nullptr, 0)->fClsInfo,
            factory_.keyword_class_info());

  CNodeFactory factory(pool_, States(), KeywordSet(), {});
  for (int32_t state : {tok::AWAIT, tok::ASYNC}) {
    ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fFirstFree'",
                [&] { factory.ConvertSingleNode(state, "async", Context::None(), nullptr, 0); });
  }
  ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fFirstFree'",
              [&] { factory.NewKeywordNode("if", Context::None()); });
}

TEST_F(TreeTest, OnlyOperatorsMakeOperatorNodes) {
  CNode* plus = factory_.CreateOperatorNode("+", Context::Index(1));
  ASSERT_NE(plus, nullptr);
  EXPECT_EQ(plus->fClsInfo, factory_.class_info(tok::PLUS));
  EXPECT_EQ(plus->fText(), "+");
  EXPECT_EQ(plus->code, tok::PLUS);
  EXPECT_EQ(factory_.CreateOperatorNode("plus", Context::None()), nullptr);
}

TEST_F(TreeTest, AStateOutsideTheListIsAnIndexError) {
  const int32_t count = static_cast<int32_t>(factory_.state_count());
  ExpectError(ErrorKind::kIndexError, "list index out of range",
              [&] { factory_.ConvertSingleNode(count, "x", Context::None(), nullptr, 0); });
  ExpectError(ErrorKind::kIndexError, "list index out of range",
              [&] { factory_.ConvertSingleNode(-count - 1, "x", Context::None(), nullptr, 0); });
  // From the end, as the host's lists count.
  EXPECT_EQ(factory_.ConvertSingleNode(-1, "x", Context::None(), nullptr, 0)->kind, NodeKind::kCTypeParameter);
}

TEST_F(TreeTest, ARuleOfOneChildIsAnAssertionError) {
  CNode* child = Name("x");
  ExpectError(ErrorKind::kAssertionError, "",
              [&] { factory_.ConvertSingleNode(kFirstSymbol, kNoText, Context::None(), &child, 1); });
  ExpectError(ErrorKind::kAssertionError, "",
              [&] { factory_.ConvertSingleNode(kFirstSymbol, kNoText, Context::None(), &child, 0); });
}

TEST_F(TreeTest, AStatementAndItsLineEndBecomeTheStatement) {
  CNode* statement = Name("x");
  CNode* line_end = Leaf(tok::NEWLINE, "\n");
  CNode* both[] = {statement, line_end};
  EXPECT_EQ(factory_.ConvertSingleNode(StateOf(NodeKind::kCNode), kNoText, Context::None(), both, 2), statement);
  EXPECT_EQ(factory_.class_info(tok::NEWLINE)->fFirstFree, line_end);
  EXPECT_TRUE(IsNone(line_end->fText()));
  EXPECT_EQ(statement->fText(), "x");
  // The parser's own entry does the same.
  CNode* next_line_end = Leaf(tok::NEWLINE, "\n");
  EXPECT_EQ(next_line_end, line_end);
  EXPECT_EQ(factory_.ConvertRule(StateOf(NodeKind::kCNode), both, 2), statement);
  EXPECT_EQ(factory_.class_info(tok::NEWLINE)->fFirstFree, line_end);
}

TEST_F(TreeTest, ThreeChildrenKeepTheirLineEnd) {
  CNode* children[] = {Name("a"), Name("b"), Leaf(tok::NEWLINE, "\n")};
  CNode* node = factory_.ConvertSingleNode(StateOf(NodeKind::kCNode), kNoText, Context::None(), children, 3);
  EXPECT_EQ(node->ChildCount(), 3u);
  EXPECT_EQ(node->LastChild()->fText(), "\n");
}

TEST_F(TreeTest, ASecondChildWithoutARecordIsNoLineEnd) {
  CNode* children[] = {Name("a"), factory_.NewBare<CPatternNode>()};
  CNode* node = factory_.ConvertSingleNode(StateOf(NodeKind::kCNode), kNoText, Context::None(), children, 2);
  EXPECT_EQ(node->ChildCount(), 2u);
}

TEST_F(TreeTest, ATokenWithChildrenKeepsItsLineEnd) {
  CNode* children[] = {Name("a"), Leaf(tok::NEWLINE, "\n")};
  EXPECT_EQ(factory_.ConvertSingleNode(tok::NAME, "x", Context::None(), children, 2)->ChildCount(), 2u);
}

TEST_F(TreeTest, AnAbsentSecondChildIsAnAttributeError) {
  CNode* children[] = {Name("a"), nullptr};
  ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fClsInfo'",
              [&] { factory_.ConvertSingleNode(StateOf(NodeKind::kCNode), kNoText, Context::None(), children, 2); });
}

TEST_F(TreeTest, ARuleHasTheContextOfItsFirstToken) {
  CNode* first = factory_.NewNameNode("a", Context::Index(5));
  CNode* children[] = {first, factory_.NewNameNode("b", Context::Index(6))};
  CNode* inner = factory_.ConvertRule(StateOf(NodeKind::kCDottedName), children, 2);
  EXPECT_EQ(inner->fContext, Context::Index(5));
  CNode* outer[] = {inner, Name("c")};
  EXPECT_EQ(factory_.ConvertRule(StateOf(NodeKind::kCDottedName), outer, 2)->fContext, Context::Index(5));
}

TEST_F(TreeTest, ChildrenAreTakenOutAndSetAnew) {
  CNode* node = Rule(NodeKind::kCDottedName, {Name("a"), Name("b"), Name("c")});
  EXPECT_EQ(factory_.PopChild(node, 1)->fText(), "b");
  ASSERT_EQ(node->ChildCount(), 2u);
  EXPECT_EQ(node->GetChildText(1), "c");
  ExpectError(ErrorKind::kIndexError, "list index out of range", [&] { factory_.PopChild(node, 2); });
  const std::vector<CNode*> many(40, Name("d"));
  factory_.SetChildren(node, many);
  EXPECT_EQ(node->ChildCount(), 40u);
  EXPECT_EQ(node->GetChildText(39), "d");
}

// ---- giving back ----

TEST_F(TreeTest, ADiscardedNodeIsUsedAgain) {
  CNode* node = Rule(NodeKind::kCDottedName, {Name("a"), Name("b")});
  factory_.DiscardNodes(node);
  EXPECT_FALSE(node->has_children);
  EXPECT_TRUE(node->fContext.IsNone());
  const size_t constructed = pool_->node_count();
  CNode* child = factory_.NewNameNode("c", Context::Index(9));
  CNode* children[] = {child, child};
  CNode* again =
      factory_.NewNode(factory_.class_info(StateOf(NodeKind::kCDottedName)), kNoText, Context::Index(8), children, 2);
  EXPECT_EQ(again, node);
  EXPECT_EQ(again->fContext, Context::Index(8));
  EXPECT_EQ(again->GetChildText(1), "c");
  EXPECT_EQ(pool_->node_count(), constructed);
}

TEST_F(TreeTest, AChildOfTheSameStateComesOffTheListBeforeItsParent) {
  std::vector<CNode*> chain = Chain(NodeKind::kCDottedName, 2);
  FinishedWithNode(chain[0]);
  EXPECT_EQ(Rule(NodeKind::kCDottedName, {}), chain[1]);
  EXPECT_EQ(Rule(NodeKind::kCDottedName, {}), chain[0]);
}

TEST_F(TreeTest, ChildrenGoBackFirstToLast) {
  CNode* a = Name("a");
  CNode* b = Name("b");
  FinishedWithNode(Rule(NodeKind::kCDottedName, {a, b}));
  EXPECT_EQ(Name("x"), b);
  EXPECT_EQ(Name("y"), a);
}

TEST_F(TreeTest, StatesThatShareAClassHaveListsOfTheirOwn) {
  CNode* comma = Leaf(tok::COMMA, ",");
  FinishedWithNode(comma);
  EXPECT_NE(Leaf(tok::COLON, ":"), comma);
  EXPECT_EQ(Leaf(tok::COMMA, ","), comma);
}

TEST_F(TreeTest, TheLinkOfANodeInUseKeepsItsValue) {
  CNode* a = Name("a");
  CNode* b = Name("b");
  FinishedWithNode(a);
  FinishedWithNode(b);
  EXPECT_EQ(Name("c"), b);
  EXPECT_EQ(b->fNextFree, a);
}

TEST_F(TreeTest, AFailedStateKeepsNothingOfAnAbsentChild) {
  CNode* a = Name("a");
  CNode* b = Name("b");
  CNode* node = Rule(NodeKind::kCDottedName, {a, nullptr, b});
  ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fClsInfo'",
              [&] { FinishedWithNode(node); });
  // What was done stays done: the first child is wiped, the parent on its list with its children.
  EXPECT_TRUE(IsNone(a->fText()));
  EXPECT_EQ(b->fText(), "b");
  EXPECT_EQ(node->ChildCount(), 3u);
  EXPECT_EQ(factory_.class_info(StateOf(NodeKind::kCDottedName))->fFirstFree, node);
  // As a leaf it has no children again.
  CNode* again = factory_.NewNode(node->fClsInfo, "x", Context::None(), nullptr, 0);
  EXPECT_EQ(again, node);
  EXPECT_FALSE(again->has_children);
}

TEST_F(TreeTest, DiscardingNothingIsAnAttributeError) {
  ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fClsInfo'",
              [&] { FinishedWithNode(nullptr); });
}

TEST_F(TreeTest, AChainOf101IsRecycledWhole) {
  std::vector<CNode*> chain = Chain(NodeKind::kCAtom, 101);
  FinishedWithNode(chain[0]);
  EXPECT_TRUE(PrintedLines().empty());
  EXPECT_EQ(FreeListLength(NodeKind::kCAtom), 101u);
}

TEST_F(TreeTest, TheNodeBelowTheDepthLimitKeepsItsFieldsAndOneLineIsPrinted) {
  std::vector<CNode*> chain = Chain(NodeKind::kCAtom, 102);
  FinishedWithNode(chain[0]);
  EXPECT_EQ(PrintedLines(), std::vector<std::string>{"depth too great"});
  EXPECT_EQ(FreeListLength(NodeKind::kCAtom), 101u);
  EXPECT_EQ(chain[101]->fContext, Context::Index(101));
  EXPECT_TRUE(chain[101]->has_children);
}

TEST_F(TreeTest, ALineIsPrintedForEachSubtreeBelowTheLimit) {
  std::vector<CNode*> chain = Chain(NodeKind::kCAtom, 101);
  CNode* children[] = {Name("a"), Name("b"), Name("c")};
  factory_.SetChildren(chain[100], children);
  FinishedWithNode(chain[0]);
  EXPECT_EQ(PrintedLines().size(), 3u);
  EXPECT_EQ(children[2]->fText(), "c");
}

TEST_F(TreeTest, AStartingDepthShortensTheDescent) {
  std::vector<CNode*> chain = Chain(NodeKind::kCAtom, 3);
  FinishedWithNodeAtDepth(chain[0], 99);
  EXPECT_EQ(PrintedLines().size(), 1u);
  EXPECT_EQ(FreeListLength(NodeKind::kCAtom), 2u);
  FinishedWithNodeAtDepth(nullptr, 101);
  EXPECT_EQ(PrintedLines().size(), 2u);
}

TEST_F(TreeTest, AHugeNegativeDepthCannotOverflowTheMachineStack) {
  FinishedWithNodeAtDepth(Chain(NodeKind::kCAtom, 2'000'000)[0], INT64_MIN);
  EXPECT_EQ(PrintedLines().size(), 1u);
  EXPECT_EQ(FreeListLength(NodeKind::kCAtom), 1001u);
}

TEST_F(TreeTest, DeepTreesDiscardedAgainAndAgainTakeNoMoreMemory) {
  size_t constructed = 0;
  for (int round = 0; round < 20; ++round) {
    FinishedWithNode(Chain(NodeKind::kCAtom, 10'000)[0]);
    if (round == 1) constructed = pool_->node_count();
  }
  EXPECT_EQ(pool_->node_count(), constructed);
  EXPECT_EQ(PrintedLines().size(), 20u);
}

TEST_F(TreeTest, WideTreesDiscardedAgainAndAgainTakeNoMoreMemory) {
  size_t constructed = 0;
  for (int round = 0; round < 5; ++round) {
    std::vector<CNode*> children;
    for (int i = 0; i < 100'000; ++i) children.push_back(Name("x"));
    CNode* node = Rule(NodeKind::kCTestListStarExpr, {});
    factory_.SetChildren(node, children);
    FinishedWithNode(node);
    // The long list of children has gone, a short one would have stayed.
    EXPECT_EQ(node->child_capacity, 0u);
    if (round == 0) constructed = pool_->node_count();
  }
  EXPECT_EQ(pool_->node_count(), constructed);
}

TEST_F(TreeTest, WhatTheHostMaySeeIsReclaimedWhenItNoLongerLooks) {
  pool_->host_views = 1;
  std::vector<CNode*> chain = Chain(NodeKind::kCAtom, 10'000);
  FinishedWithNode(chain[0]);
  FinishedWithNode(Name("x"));
  EXPECT_EQ(chain[9'999]->fContext, Context::Index(9'999));
  EXPECT_EQ(FreeListLength(NodeKind::kCAtom), 101u);
  pool_->host_views = 0;
  pool_->HostViewsDropped();
  EXPECT_EQ(FreeListLength(NodeKind::kCAtom), 10'000u);
  EXPECT_TRUE(chain[9'999]->fContext.IsNone());
}

TEST_F(TreeTest, ReclaimLeavesNothingOfATree) {
  CNode* name = Name("a");
  CNode* bare = factory_.NewBare<CPatternNode>();
  CNode* children[] = {name, nullptr};
  factory_.SetChildren(bare, children);
  CNode* node = Rule(NodeKind::kCExprStmt, {bare, Name("b")});
  pool_->Reclaim(node);
  EXPECT_EQ(FreeListLength(NodeKind::kCExprStmt), 1u);
  EXPECT_TRUE(IsNone(name->fText()));
  EXPECT_EQ(factory_.NewBare<CMatchStmt>(), bare);
  pool_->Reclaim(nullptr);
}

TEST_F(TreeTest, ReclaimGivesEachNodeBackToThePoolItIsFrom) {
  Ref<NodePool> other(new NodePool);
  CNode* foreign = other->Construct(NodeKind::kCPatternNode, nullptr);
  other->ResizeChildren(foreign, 20)[0] = Name("a");
  std::fill_n(foreign->children + 1, 19, nullptr);
  CNode* bare = factory_.NewBare<CPatternNode>();
  CNode* children[] = {foreign, nullptr};
  factory_.SetChildren(bare, children);
  pool_->Reclaim(bare);
  EXPECT_EQ(factory_.NewBare<CMatchStmt>(), bare);
  EXPECT_NE(static_cast<CNode*>(factory_.NewBare<CMatchStmt>()), foreign);
  EXPECT_EQ(other->Construct(NodeKind::kCMatchStmt, nullptr), foreign);
}

TEST_F(TreeTest, ArraysOfChildrenAreNotUsedAgainWhileTheCoreWaits) {
  CNode* node = factory_.NewBare<CPatternNode>();
  CNode* children[] = {Name("a"), Name("b")};
  factory_.SetChildren(node, children);
  const std::span<CNode* const> before = node->fChildren();
  NodePool::is_core_waiting = [] { return true; };
  pool_->ResizeChildren(node, 20);
  std::fill_n(node->children, 20, nullptr);
  const std::span<CNode* const> grown = node->fChildren();
  pool_->ClearChildren(node);
  factory_.SetChildren(factory_.NewBare<CPatternNode>(), std::span<CNode* const>(children, 1));
  EXPECT_EQ(before[0], children[0]);
  EXPECT_EQ(before[1], children[1]);
  EXPECT_EQ(grown[19], nullptr);
  CNode* other = factory_.NewBare<CPatternNode>();
  factory_.SetChildren(other, children);
  EXPECT_NE(other->children, before.data());
  NodePool::is_core_waiting = nullptr;
  // The next array that goes takes them along.
  pool_->ResizeChildren(other, 20);
  CNode* last = factory_.NewBare<CPatternNode>();
  factory_.SetChildren(last, children);
  CNode* another = factory_.NewBare<CPatternNode>();
  factory_.SetChildren(another, children);
  EXPECT_TRUE(last->children == before.data() || another->children == before.data());
}

TEST_F(TreeTest, ArraysOfChildrenAreUsedAgainBehindTheLastViewOfAHost) {
  CNode* node = factory_.NewBare<CPatternNode>();
  CNode* children[] = {Name("a"), Name("b")};
  factory_.SetChildren(node, children);
  CNode** const before = node->children;
  NodePool::is_core_waiting = [] { return true; };
  pool_->ClearChildren(node);
  pool_->ResizeChildren(node, 20);
  std::fill_n(node->children, 20, nullptr);
  pool_->HostViewsDropped();
  CNode* const other = factory_.NewBare<CPatternNode>();
  factory_.SetChildren(other, children);
  EXPECT_NE(other->children, before);
  NodePool::is_core_waiting = nullptr;
  pool_->HostViewsDropped();
  CNode* const last = factory_.NewBare<CPatternNode>();
  factory_.SetChildren(last, children);
  EXPECT_EQ(last->children, before);
}

TEST_F(TreeTest, ReclaimWaitsWhileTheHostLooks) {
  pool_->host_views = 2;
  CNode* node = Rule(NodeKind::kCExprStmt, {Name("a"), Name("b")});
  pool_->Reclaim(node);
  EXPECT_EQ(node->ChildCount(), 2u);
  pool_->host_views = 0;
  // The next discard takes it up, without a call of the host's.
  FinishedWithNode(Name("c"));
  EXPECT_EQ(FreeListLength(NodeKind::kCExprStmt), 1u);
}

TEST_F(TreeTest, StraysAreTakenBackAndWhatIsReachedStays) {
  pool_->host_views = 1;
  CNode* seen = Rule(NodeKind::kCExprStmt, {Name("a"), Name("b")});
  CNode* stray = Rule(NodeKind::kCExprStmt, {Name("c"), factory_.NewBare<CPatternNode>()});
  CNode* abandoned = Rule(NodeKind::kCExprStmt, {Name("d"), Name("e")});
  pool_->Reclaim(abandoned);
  CNode* bare = factory_.NewBare<CMatchStmt>();
  FinishedWithNode(bare);
  FinishedWithNode(Name("f"));
  const size_t constructed = pool_->node_count();
  for (CNode* node : {seen, seen->children[0], seen->children[1]}) node->is_reached = true;
  pool_->TakeBackStrays(3);
  for (CNode* node : {seen, seen->children[0], seen->children[1]}) node->is_reached = false;

  EXPECT_EQ(seen->children[1]->fText(), "b");
  EXPECT_FALSE(stray->has_children);
  EXPECT_FALSE(abandoned->has_children);
  EXPECT_EQ(FreeListLength(NodeKind::kCExprStmt), 2u);
  for (int i = 0; i < 4; ++i) Name("g");  // c, d, e and f
  // The two without a record, one of which waited, are used again.
  factory_.NewBare<CPatternNode>();
  EXPECT_EQ(factory_.NewBare<CMatchStmt>()->pool, pool_.get());
  EXPECT_EQ(pool_->node_count(), constructed);
  pool_->host_views = 0;
  pool_->HostViewsDropped();
  EXPECT_EQ(FreeListLength(NodeKind::kCExprStmt), 2u);
}

TEST_F(TreeTest, WhatIsKeptForAnotherUseIsNoStray) {
  CNode* nodes[] = {factory_.NewBare<CPatternNode>(), factory_.NewBare<CMatchStmt>(),
                    factory_.NewBare<CTypeParameter>()};
  for (CNode* node : nodes) FinishedWithNode(node);
  pool_->TakeBackStrays(0);
  std::set<CNode*> used;
  for (int i = 0; i < 6; ++i) used.insert(factory_.NewBare<CPatternNode>());
  EXPECT_EQ(used.size(), 6u);
}

TEST_F(TreeTest, AFreeListThatIsARingHoldsNoStrays) {
  CNode* node = Name("a");
  FinishedWithNode(node);
  FinishedWithNode(node);
  CNode* stray = Name("b");
  EXPECT_EQ(stray, node);
  pool_->TakeBackStrays(0);
  EXPECT_EQ(Name("c"), node);
}

TEST_F(TreeTest, ASearchForStraysPaysOnceThereMayBeManyOfThem) {
  EXPECT_FALSE(pool_->MayHoldStrays());
  for (int i = 0; i < 64; ++i) pool_->CountStray();
  EXPECT_TRUE(pool_->MayHoldStrays());
  pool_->TakeBackStrays(4000);
  for (int i = 0; i < 999; ++i) pool_->CountStray();
  EXPECT_FALSE(pool_->MayHoldStrays());
  pool_->CountStray();
  EXPECT_TRUE(pool_->MayHoldStrays());
}

TEST_F(TreeTest, ANodeWithoutARecordIsWipedAndItsMemoryUsedAgain) {
  CMatchStmt* match = factory_.NewBare<CMatchStmt>();
  CNode* children[] = {Name("match"), Name("x")};
  factory_.SetChildren(match, children);
  FinishedWithNode(match);
  EXPECT_FALSE(match->has_children);
  EXPECT_EQ(FreeListLength(NodeKind::kCMatchStmt), 0u);
  const size_t constructed = pool_->node_count();
  CTypeParameter* next = factory_.NewBare<CTypeParameter>();
  EXPECT_EQ(static_cast<CNode*>(next), match);
  EXPECT_EQ(next->kind, NodeKind::kCTypeParameter);
  EXPECT_EQ(next->fNextFree, nullptr);
  EXPECT_EQ(pool_->node_count(), constructed);
}

TEST_F(TreeTest, ANodeWithoutARecordIsNotUsedAgainWhileTheHostMaySeeIt) {
  CMatchStmt* match = factory_.NewBare<CMatchStmt>();
  pool_->host_views = 1;
  FinishedWithNode(match);
  EXPECT_EQ(match->fNextFree, nullptr);
  CTypeParameter* next = factory_.NewBare<CTypeParameter>();
  EXPECT_NE(static_cast<CNode*>(next), match);
  EXPECT_EQ(match->kind, NodeKind::kCMatchStmt);
  pool_->host_views = 0;
  pool_->HostViewsDropped();
  EXPECT_EQ(factory_.NewBare<CPatternNode>(), static_cast<CNode*>(match));
}

TEST_F(TreeTest, ANodeWithoutARecordThatIsGivenBackTwiceIsHandedOutOnce) {
  CNode* node = factory_.NewBare<CPatternNode>();
  FinishedWithNode(node);
  FinishedWithNode(node);
  EXPECT_EQ(factory_.NewBare<CPatternNode>(), node);
  EXPECT_NE(factory_.NewBare<CPatternNode>(), node);
}

TEST_F(TreeTest, ANodeGivenBackTwiceIsHandedOutForEver) {
  CNode* node = Name("a");
  FinishedWithNode(node);
  FinishedWithNode(node);
  EXPECT_EQ(Name("b"), node);
  EXPECT_EQ(Name("c"), node);
}

TEST_F(TreeTest, ATreeThatHoldsItselfIsDiscardedInBoundedTime) {
  CNode* node = Rule(NodeKind::kCAtom, {});
  const std::vector<CNode*> itself(40, node);
  factory_.SetChildren(node, itself);
  FinishedWithNode(node);
  EXPECT_EQ(PrintedLines().size(), 40u);
  EXPECT_FALSE(node->has_children);
}

// ---- what nodes hold on to ----

std::vector<int32_t>& Released() {
  static std::vector<int32_t> numbers;
  return numbers;
}

TEST_F(TreeTest, AContextOfTheHostsIsReleasedOnce) {
  Released().clear();
  pool_->release_foreign = [](int32_t number) { Released().push_back(number); };
  CNode* node = factory_.NewNameNode("a", Context::Foreign(7));
  FinishedWithNode(node);
  EXPECT_EQ(Released(), std::vector<int32_t>{7});
  FinishedWithNode(factory_.NewNameNode("b", Context::Index(7)));
  EXPECT_EQ(Released().size(), 1u);
  // A rule that vanishes lets go of its context at once.
  CNode* both[] = {Name("x"), Leaf(tok::NEWLINE, "\n")};
  factory_.ConvertSingleNode(StateOf(NodeKind::kCNode), kNoText, Context::Foreign(8), both, 2);
  EXPECT_EQ(Released(), (std::vector<int32_t>{7, 8}));
}

TEST(NodePoolTest, APoolThatGoesReleasesTheContextsOfItsNodes) {
  Released().clear();
  {
    Ref<NodePool> pool(new NodePool);
    pool->release_foreign = [](int32_t number) { Released().push_back(number); };
    pool->Construct(NodeKind::kCNode, nullptr)->fContext = Context::Foreign(3);
  }
  EXPECT_EQ(Released(), std::vector<int32_t>{3});
}

TEST(NodePoolTest, EqualTextsAreInternedOnce) {
  NodePool* pool = new NodePool;
  Ref<NodePool> keep(pool);
  const std::string text = "a text that is long enough to stand on the heap";
  const Text first = pool->Intern(text);
  EXPECT_NE(first.data(), text.data());
  EXPECT_EQ(first.data(), pool->Intern(std::string(text)).data());
  EXPECT_TRUE(IsNone(pool->Intern(kNoText)));
  EXPECT_FALSE(IsNone(pool->Intern("")));
}

TEST(NodePoolTest, ChildrenStayWhenTheirListGrows) {
  Ref<NodePool> pool(new NodePool);
  CNode* node = pool->Construct(NodeKind::kCNode, nullptr);
  CNode* child = pool->Construct(NodeKind::kCNode, nullptr);
  for (uint32_t count = 1; count <= 100; ++count) {
    pool->ResizeChildren(node, count)[count - 1] = child;
    for (uint32_t i = 0; i < count; ++i) ASSERT_EQ(node->children[i], child);
  }
  EXPECT_EQ(node->child_capacity, 100u);
}

TEST(NodePoolTest, NodesStandOnCacheLines) {
  Ref<NodePool> pool(new NodePool);
  for (int i = 0; i < 300; ++i) {
    EXPECT_EQ(reinterpret_cast<uintptr_t>(pool->Construct(NodeKind::kCAtom, nullptr)) % 64, 0u);
  }
  EXPECT_EQ(pool->node_count(), 300u);
}

}  // namespace
}  // namespace quillet
