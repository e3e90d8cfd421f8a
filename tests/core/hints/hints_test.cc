// Hints: the dispatch of a walk and its limits, annotations, type comments, signature comments, and
// where an error in a hint points.
#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "hints/hint_walker.h"
#include "lines/type_comment.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/expect_error.h"
#include "tests/core/support/tree_text.h"

namespace quillet {
namespace {

using testing::Analyze;
using testing::AnalyzedLine;
using testing::AnalyzerFor;
using testing::ConsoleCapture;
using testing::HintRecords;
using testing::kPy2;
using testing::kPy3;
using testing::ParsedLine;
using testing::ReadNames;
using testing::ReportedErrors;
using Names = std::vector<std::string>;

CTypeHintWalker& HintWalker() { return AnalyzerFor(kPy3).type_hint_walker(); }

// ---- the dispatch walker ----

using Action = CDispatchWalker::Action;

Names& Visited() {
  static Names visited;
  return visited;
}

bool VisitAndDescend(CDispatchWalker&, CNode* node) {
  Visited().push_back(testing::ShowTree(node));
  return true;
}
bool VisitAndStop(CDispatchWalker&, CNode* node) {
  Visited().push_back(testing::ShowTree(node));
  return false;
}

// Visits of a host's, by a function.
template <class Function>
class Visits final : public CDispatchWalker::HostVisits {
 public:
  explicit Visits(Function function) : function_(std::move(function)) {}
  bool Visit(CNode* node) override { return function_(node); }

 private:
  Function function_;
};

Names WalkBy(Text text, NodeKind kind, CDispatchWalker::Entry entry) {
  Visited().clear();
  CDispatchWalker::Table table;
  table[static_cast<size_t>(NodeKind::kCNameLiteral)] = {Action::kVisit, VisitAndStop};
  table[static_cast<size_t>(kind)] = entry;
  CDispatchWalker walker(table);
  const testing::ParsedLine line(text);
  walker.Walk(line.root(), &line.line(), false);
  return Visited();
}

TEST(DispatchWalker, AClassWithoutAnEntryHasItsChildrenVisited) {
  EXPECT_EQ(WalkBy("f(a)", NodeKind::kCPassStmt, {}), (Names{"f", "a"}));
}

TEST(DispatchWalker, AVisitDecidesWhetherTheWalkGoesDown) {
  EXPECT_EQ(WalkBy("f(a)", NodeKind::kCTrailer, {Action::kVisit, VisitAndStop}), (Names{"f", "trailer(( a ))"}));
  EXPECT_EQ(WalkBy("f(a)", NodeKind::kCTrailer, {Action::kVisit, VisitAndDescend}),
            (Names{"f", "trailer(( a ))", "a"}));
}

TEST(DispatchWalker, APrunedClassIsNeitherVisitedNorEntered) {
  EXPECT_EQ(WalkBy("f(a)", NodeKind::kCTrailer, {Action::kPrune, nullptr}), (Names{"f"}));
}

TEST(DispatchWalker, SubclassesHaveNoPartInAnEntryOfTheirBase) {
  EXPECT_EQ(WalkBy("f(a)", NodeKind::kCExpression, {Action::kPrune, nullptr}), (Names{"f", "a"}));
}

TEST(DispatchWalker, AHostDecidesForEveryNode) {
  CDispatchWalker walker(CDispatchWalker::Table{});
  Names seen;
  Visits visits([&](CNode* node) {
    seen.push_back(testing::ShowTree(node));
    return !isa<CTrailer>(node);
  });
  walker.host_visits = &visits;
  const testing::ParsedLine line("f(a)");
  walker.Walk(line.root(), &line.line(), false);
  EXPECT_EQ(seen, (Names{"atom_expr(f trailer(( a )))", "f", "trailer(( a ))"}));
}

TEST(DispatchWalker, TheStackHoldsTheAncestors) {
  CDispatchWalker walker(CDispatchWalker::Table{});
  size_t deepest = 0;
  Visits visits([&](CNode*) {
    deepest = std::max(deepest, walker.fNodeStack.size());
    return true;
  });
  walker.host_visits = &visits;
  const testing::ParsedLine line("f(a)");
  walker.Walk(line.root(), &line.line(), false);
  EXPECT_EQ(deepest, 3u);
  EXPECT_TRUE(walker.fNodeStack.empty());
}

// A chain of bare nodes, `levels` deep.
class Chain {
 public:
  explicit Chain(int levels) : pool_(new NodePool), nodes_(static_cast<size_t>(levels)) {
    for (CNode*& node : nodes_) node = pool_->Construct(NodeKind::kCNode, nullptr);
    for (size_t i = 0; i + 1 < nodes_.size(); ++i) pool_->ResizeChildren(nodes_[i], 1)[0] = nodes_[i + 1];
  }
  CNode* root() const { return nodes_.front(); }

 private:
  Ref<NodePool> pool_;
  std::vector<CNode*> nodes_;
};

TEST(DispatchWalker, ADepthOf40IsWalkedAnd41PrintsALine) {
  const ConsoleCapture capture;
  CDispatchWalker walker(CDispatchWalker::Table{});
  LogicalLine line;
  walker.Walk(Chain(40).root(), &line, false);
  EXPECT_EQ(capture.PrintedLines(), Names{});
  const Chain deep(41);
  walker.Walk(deep.root(), &line, false);
  EXPECT_EQ(capture.PrintedLines(),
            Names{"RuntimeError raised in CNodeWalker.Walk: Maximum recurse count in _VisitNode exceeded"});
  EXPECT_TRUE(walker.fNodeStack.empty());
  EXPECT_EQ(walker.fLogical, nullptr);
}

TEST(DispatchWalker, TenThousandVisitsAreMadeAndTheNextPrintsALine) {
  const ConsoleCapture capture;
  CDispatchWalker walker(CDispatchWalker::Table{});
  LogicalLine line;
  const Ref<NodePool> pool(new NodePool);
  CNode* root = pool->Construct(NodeKind::kCNode, nullptr);
  const auto set_children = [&](uint32_t count) {
    CNode** children = pool->ResizeChildren(root, count);
    for (uint32_t i = 0; i < count; ++i) children[i] = pool->Construct(NodeKind::kCNode, nullptr);
  };
  set_children(9999);
  walker.Walk(root, &line, false);
  EXPECT_EQ(capture.PrintedLines(), Names{});
  set_children(10000);
  walker.Walk(root, &line, false);
  EXPECT_EQ(capture.PrintedLines(),
            Names{"RuntimeError raised in CNodeWalker.Walk: Maximum number of calls to _VisitNode exceeded"});
}

TEST(DispatchWalker, ASecondWalkIsRefusedAndDoesNotDisturbTheFirst) {
  CDispatchWalker walker(CDispatchWalker::Table{});
  const testing::ParsedLine line("f(a)");
  std::string refusal;
  int visit_count = 0;
  Visits visits([&](CNode*) {
    if (++visit_count == 1) {
      try {
        walker.Walk(line.root(), &line.line(), false);
      } catch (const Error& error) {
        refusal = error.message();
      }
    }
    return true;
  });
  walker.host_visits = &visits;
  walker.Walk(line.root(), &line.line(), false);
  EXPECT_EQ(refusal, "Only one logical may be walked at a time");
  EXPECT_EQ(visit_count, 6);
}

TEST(DispatchWalker, AnExceptionOfAVisitPassesAndLeavesTheWalkerIdle) {
  CDispatchWalker walker(CDispatchWalker::Table{});
  const testing::ParsedLine line("f(a)");
  bool fail = true;
  Visits visits([&](CNode* node) -> bool {
    if (fail && isa<CTrailer>(node)) ThrowError(ErrorKind::kKeyError, "k");
    return true;
  });
  walker.host_visits = &visits;
  EXPECT_THROW(walker.Walk(line.root(), &line.line(), false), Error);
  EXPECT_EQ(walker.fLogical, nullptr);
  EXPECT_EQ(walker.fVisitCount, 0);
  EXPECT_TRUE(walker.fNodeStack.empty());
  fail = false;
  walker.Walk(line.root(), &line.line(), false);
}

TEST(DispatchWalker, AnAbsentChildIsAnAttributeError) {
  const Ref<NodePool> pool(new NodePool);
  CNode* root = pool->Construct(NodeKind::kCNode, nullptr);
  pool->ResizeChildren(root, 1)[0] = nullptr;
  CDispatchWalker walker(CDispatchWalker::Table{});
  LogicalLine line;
  try {
    walker.Walk(root, &line, false);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kAttributeError);
  }
}

TEST(TypeHintWalker, AnAbsentChildIsAnAttributeError) {
  const ParsedLine line("assert a, b\n");
  CNode* const kept = std::exchange(line.root()->children[0], nullptr);
  test::ExpectError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fChildren'",
                    [&] { HintWalker().Walk(line.root(), &line.line(), false); });
  line.root()->children[0] = kept;
}

TEST(TypeHintWalker, AContextOutsideOfTheTokensIsAnIndexError) {
  const ParsedLine line("x = y  # type: int\n");
  CNode* leaf = line.root();
  while (!leaf->IsLeaf()) leaf = leaf->ChildAt(-1);
  const Context kept = leaf->fContext;
  leaf->fContext = Context::Index(-100);
  test::ExpectError(ErrorKind::kIndexError, "list index out of range",
                    [&] { HintWalker().Walk(line.root(), &line.line(), false); });
  leaf->fContext = kept;
}

// ---- annotations ----

struct HintCase {
  const char* source;
  Names hints;
};

void ExpectHints(const std::vector<HintCase>& cases, Version version = kPy3, bool first_in_def = false) {
  for (const HintCase& c : cases) {
    const AnalyzedLine line = Analyze(c.source, version, false, first_in_def);
    EXPECT_EQ(line.error, "") << c.source;
    EXPECT_EQ(HintRecords(line), c.hints) << c.source;
  }
}

TEST(Annotations, GiveTheirTextToTheName) {
  ExpectHints({
      {"x: int = 1", {"x int"}},
      {"x: int", {"x int"}},
      {"self.x: List[int] = []", {"self.x List[int]"}},
      {"x: 'List[int]' = []", {"x List[int]"}},
      {"x[0]: int = 1", {}},
      {"def f(a: int, b: str = 's', *c: float, **d: T) -> bool: pass",
       {"arg: a int", "arg: b str", "arg: c float", "arg: d T", "arg: return bool"}},
      {"def f(a: int): pass", {"arg: a int"}},
      {"def f(a, b): pass", {}},
      {"def f() -> 'X': pass", {"arg: return X"}},
      {"async def f(a: int): pass", {"arg: a int"}},
      {"def f[T](a: T): pass", {"arg: a T"}},
  });
}

// The "=" of an annotated assignment belongs to the annotation and counts for no comment.
TEST(Annotations, AreProcessedWhateverCommentsTheLineHas) {
  ExpectHints({{"x: int = 1  # type: str", {"x int"}}, {"x: int  # type: str", {"x int"}}});
}

TEST(Annotations, AnAnnotationThatIsNoExpressionIsAnInternalFailure) {
  const ConsoleCapture capture;
  const AnalyzedLine line = Analyze("x: ... = 1");
  EXPECT_EQ(line.error, "");
  EXPECT_EQ(line.records, Names{});
  ASSERT_EQ(ReportedErrors().size(), 1u);
  EXPECT_NE(ReportedErrors()[0].find("TypeError"), std::string::npos);
}

// ---- comments of statements ----

TEST(TypeComments, OfAssignments) {
  ExpectHints({
      {"x = 1  # type: int", {"x int"}},
      {"x = 1  #type:int", {"x int"}},
      {"x = 1  # type: ignore", {}},
      {"x = 1  # type: Ignore", {"x Ignore"}},
      {"x = 1  # type: ignore[attr]", {"x ignore[attr]"}},
      {"x = 1  # type: int  # why", {"x int"}},
      {"x = 1  # note # type: int", {"x int"}},
      {"x = 1  # mytype: int", {}},
      {"x = 1  # see type: int", {}},
      {"x = 1  # type:", {}},
      {"x = 1  # type: # why", {}},
      {"x = 1  # type: a = b; c", {}},
      {"a, b = 1, 2  # type: int, str", {"a int", "b str"}},
      {"(a, (b, c)) = f()  # type: int, (str, X)", {"a int", "b str", "c X"}},
      {"a, b = f()  # type: int", {}},
      {"a, b, c = f()  # type: int, str", {"a int", "b str"}},
      {"a = f()  # type: int, str", {"a int, str"}},
      {"self.x = 1  # type: int", {"self.x int"}},
      {"x[0] = 1  # type: int", {}},
      {"a = b = 1  # type: int", {"a int"}},
      {"x += 1  # type: int", {}},
      {"f(x)  # type: int", {}},
      {"x = 1  # type: 'List[int]'", {"x List[int]"}},
      {"x = (1, # type: str\n 2)  # type: int", {"x int"}},
      {"x = (1, # type: int\n 2)", {}},
      {"x = '''\n\n'''  # type: str", {"x str"}},
  });
}

TEST(TypeComments, OfATupleAreRecordedAsTheyRead) {
  // One name takes the whole hint.
  EXPECT_EQ(HintRecords(Analyze("a = f()  # type: (int, str)")), (Names{"a (int, str)"}));
}

TEST(TypeComments, NamesInThemAreReads) {
  EXPECT_EQ(ReadNames(Analyze("x = y  # type: Dict[K, V]")), (Names{"y", "Dict", "K", "V"}));
  EXPECT_EQ(ReadNames(Analyze("x[0] = 1  # type: Foo")), (Names{"x", "Foo"}));
}

TEST(TypeComments, OfLoopsAndWithStatements) {
  ExpectHints({
      {"for x in y:  # type: int", {"x int"}},
      {"for a, b in y:  # type: int, str", {"a int", "b str"}},
      {"for x in y: pass  # type: int", {"x int"}},
      {"async for x in y:  # type: int", {"x int"}},
      {"with a as b:  # type: int", {"b int"}},
      {"with a, b as c:  # type: int", {"c int"}},
      {"with a as b, c as d:  # type: int", {"b int", "d int"}},
      {"with a:  # type: int", {}},
      {"while x:  # type: int", {}},
  });
}

// A host may say where a node stands in place of which token it is.
TEST(TypeComments, EndTheRowsOfAStatementAsAHostSays) {
  const ParsedLine line("a + b");
  CNode* const first = line.root()->ChildAt(0);
  first->fContext = Context::At({7, 3});
  EXPECT_EQ(HintWalker().GetRowRange(first), std::make_pair(int64_t{7}, int64_t{8}));
  first->fContext = Context::Foreign(1);
  EXPECT_THROW(HintWalker().GetRowRange(first), Error);
}

TEST(TypeComments, OnTheOlderGrammar) {
  ExpectHints({{"x = 1  # type: int", {"x int"}}, {"for x in y:  # type: int", {"x int"}}}, kPy2);
}

struct ErrorCase {
  const char* source;
  const char* error;
};

TEST(TypeComments, ErrorsStandAtTheirColumnOfTheComment) {
  const ErrorCase cases[] = {
      {"x = 1  # type: 1 +", "1:19 invalid syntax"},
      {"x = 1  # type: )", "1:16 invalid syntax"},
      {"x = 1  # type: a b", "1:18 invalid syntax"},
      {"x = (1,\n     2)  # type: a b", "2:20 invalid syntax"},
      {"x = 1  # type: int in some prose", "1:28 invalid syntax"},
      {"x = 1  # type: List[", "1:21 invalid syntax"},
      {"x = 1  # type: case 1 2:", "1:23 invalid syntax"},
  };
  for (const ErrorCase& c : cases) {
    const AnalyzedLine line = Analyze(c.source);
    EXPECT_EQ(line.error, c.error) << c.source;
    EXPECT_EQ(line.records, Names{}) << c.source;
  }
}

TEST(TypeComments, AnErrorAtEveryOffsetOfAHintIsFound) {
  const std::string hint = "Dict[K, List[V]]";
  for (size_t at = 0; at <= hint.size(); ++at) {
    std::string broken = hint;
    broken.insert(at, " $ ");
    const std::string source = "x = 1  # type: " + broken;
    const std::string expected = "1:" + std::to_string(source.find('$') + 1) + " invalid syntax";
    EXPECT_EQ(Analyze(source).error, expected) << source;
  }
}

TEST(TypeComments, TextsOfHintsOutliveTheNextHint) {
  const testing::CutSource source("x = 1  # type: Dict[Key, Value]\ny = 2  # type: Other[Thing]\n");
  const auto first = source.Line(0);
  const auto second = source.Line(1);
  testing::AnalyzeLine(*first);
  testing::AnalyzeLine(*second);
  EXPECT_EQ(testing::RecordStrings(*first),
            (Names{"x :s:", "x :l:int: 1", "Dict :g:", "Key :g:", "Value :g:", "x :h:Dict[Key, Value]"}));
}

// ---- comments of functions ----

TEST(SignatureComments, BehindTheHead) {
  ExpectHints({
      {"def f(a, b):  # type: (int, str) -> bool", {"arg: a int", "arg: b str", "arg: return bool"}},
      {"def f():  # type: () -> None", {"arg: return None"}},
      {"def f(a, b):  # type: (...) -> int", {"arg: return int"}},
      {"def f(a):  # type: (int,) -> None", {"arg: a int", "arg: return None"}},
      {"def f(a, b):  # type: (List[int], Dict[str, int]) -> None",
       {"arg: a List[int]", "arg: b Dict[str, int]", "arg: return None"}},
      {"def f(a):  # type: (Callable[[int], str]) -> None", {"arg: a Callable[[int], str]", "arg: return None"}},
      {"def f(self, a):  # type: (int) -> str", {"arg: self int", "arg: return str"}},
      {"def f(a):  # type: (int, str) -> X", {"arg: a int", "arg: :A:1 str", "arg: return X"}},
      {"def f(a, b):  # type: (int) -> X", {"arg: a int", "arg: return X"}},
      {"def f(a: str):  # type: (int) -> X", {"arg: a str", "arg: a int", "arg: return X"}},
      {"def f(a):  # type: ignore", {}},
      {"def f(a,\n      b):  # type: (int, str) -> bool", {"arg: a int", "arg: b str", "arg: return bool"}},
  });
}

TEST(SignatureComments, NamesInThemAreReadsAndTheDummyNamesAreNot) {
  EXPECT_EQ(ReadNames(Analyze("def f(x):  # type: (Foo) -> Bar")), (Names{"Foo", "Bar"}));
}

TEST(SignatureComments, OnTheFirstLineOfABody) {
  ExpectHints({{"# type: (int) -> str", {":A:0 int", "return str"}},
               {"# type: (...) -> str", {"return str"}},
               {"# note", {}},
               {"# type: ignore", {}}},
              kPy3, true);
  ExpectHints({{"# type: (int) -> str", {}}}, kPy3, false);
}

TEST(SignatureComments, OfTheOlderGrammar) {
  ExpectHints({{"def f(a, (b, c), d):  # type: (int, str) -> bool", {"arg: a int", "arg: b str", "arg: return bool"}}},
              kPy2);
}

TEST(SignatureComments, BehindEachParameter) {
  ExpectHints({
      {"def f(a,  # type: int\n      b=1,  # type: str\n      *c  # type: X\n      ): pass",
       {"arg: a int", "arg: b str", "arg: c X"}},
      {"def f(a,  # type: int\n      b):\n  # type: (...) -> bool", {"arg: a int"}},
      {"def f(a: str,  # type: int\n      b): pass", {"arg: a str"}},
      {"def f(a  # type: int\n      ): pass", {"arg: a int"}},
      {"def f(a,  # note\n      b): pass", {}},
  });
}

TEST(SignatureComments, ATypedArgumentOfAFunctionWithoutParametersIsAnInternalFailure) {
  const ConsoleCapture capture;
  const AnalyzedLine line = Analyze("def f():  # type: (int) -> str");
  EXPECT_EQ(line.error, "");
  EXPECT_EQ(line.records, Names{});
  ASSERT_EQ(ReportedErrors().size(), 1u);
  EXPECT_NE(ReportedErrors()[0].find("has no len()"), std::string::npos);
}

TEST(SignatureComments, ErrorsAreMappedBackIntoTheComment) {
  const ErrorCase cases[] = {
      // The ":" behind the hint is where the parser stops.
      {"def f(a):  # type: (int -> None", "1:25 invalid syntax"},
      {"def f(a):  # type: (int) -> ", "1:28 invalid syntax"},
      {"def f(a):  # type: int", "1:20 invalid syntax"},
      {"def f(a):  # type: (a b) -> None", "1:23 invalid syntax"},
      {"def f(a):  # type: (*int) -> None", "1:21 invalid syntax"},
      {"def f(a):  # type: (int) -> List[", "1:34 invalid syntax"},
      {"def f(a):\n", ""},
  };
  for (const ErrorCase& c : cases) EXPECT_EQ(Analyze(c.source).error, c.error) << c.source;
}

TEST(SignatureComments, AreRewrittenIntoTheHeadOfAFunction) {
  const auto rewrite = [](Text hint) {
    const CTypeHintWalker::RewrittenHint rewritten = CTypeHintWalker::RewriteFuncdefCommentHint(hint);
    EXPECT_EQ(rewritten.tokens.size(), rewritten.utf8_offsets.size());
    std::string shown;
    for (size_t i = 0; i < rewritten.tokens.size(); ++i)
      shown += rewritten.tokens[i] + "@" + std::to_string(rewritten.utf8_offsets[i]) + " ";
    return shown;
  };
  EXPECT_EQ(rewrite("(int, str) -> bool"),
            "def@-13 function@-9 (@0 a@1 :@1 int@1 ,@4 a@6 :@6 str@6 )@9 ->@11 bool@14 :@18 ");
  EXPECT_EQ(rewrite("(...) -> X"), "def@-13 function@-9 (@0 )@4 ->@6 X@9 :@10 ");
  EXPECT_EQ(rewrite("(int, ...) -> X"), "def@-13 function@-9 (@0 a@1 :@1 int@1 ,@4 a@6 :@6 ...@6 )@9 ->@11 X@14 :@15 ");
  EXPECT_EQ(rewrite("(*T) -> X"), "def@-13 function@-9 (@0 a@1 :@1 *@1 T@2 )@3 ->@5 X@8 :@9 ");
  EXPECT_EQ(rewrite("(D[a, b]) -> X"), "def@-13 function@-9 (@0 a@1 :@1 D@1 [@2 a@3 ,@4 b@6 ]@7 )@8 ->@10 X@13 :@14 ");
}

// ---- the parts of comments ----

TEST(CommentHints, KeepEachCharacterAtItsColumn) {
  const auto hint_of = [](Text comment) {
    std::string hint = "none";
    return CTypeHintWalker::GetHintFromComment(comment, hint) ? hint : "none";
  };
  EXPECT_EQ(hint_of("# type: int"), "        int");
  EXPECT_EQ(hint_of("#type:int"), "      int");
  EXPECT_EQ(hint_of("# a # type: int # b"), "            int");
  EXPECT_EQ(hint_of("# type:"), "");
  EXPECT_EQ(hint_of("# type: ignore"), "none");
  EXPECT_EQ(hint_of("# type:   ignore   # x"), "none");
  EXPECT_EQ(hint_of("# mytype: int"), "none");
  EXPECT_EQ(hint_of("# nothing"), "none");
  // Blanks are counted in characters.
  EXPECT_EQ(hint_of("# \xC3\xA4 # type: int"), "            int");
}

TEST(CommentHints, DottedNames) {
  for (const char* name : {"", "a", "a.b", "_a1.b2", "a."}) EXPECT_TRUE(CTypeHintWalker::IsDottedName(name)) << name;
  for (const char* name : {"1", "a b", ".a", "a..b", "a-b", "a.1"})
    EXPECT_FALSE(CTypeHintWalker::IsDottedName(name)) << name;
}

TEST(CommentHints, TheWalkerIsIdleAfterAnError) {
  Analyze("x = 1  # type: )");
  EXPECT_EQ(HintWalker().fCommentHintCount, 0);
  EXPECT_EQ(HintWalker().fLogical, nullptr);
  EXPECT_EQ(HintRecords(Analyze("x = 1  # type: int")), (Names{"x int"}));
}

TEST(CommentHints, NodesOfHintsAreUsedAgain) {
  const ConsoleCapture capture;  // a hint that is no expression is an internal failure
  const NodePool& pool = HintWalker().hint_parser().factory().pool();
  const auto analyze = [] {
    Analyze("x = 1  # type: Dict[K, List[V]]");
    Analyze("def f(a):  # type: (Dict[K, V]) -> X");
    Analyze("x = 1  # type: Dict[K, List[V]");
    Analyze("x = 1  # type: 1 = 2");
  };
  for (int i = 0; i < 3; ++i) analyze();
  const size_t count = pool.node_count();
  for (int i = 0; i < 500; ++i) analyze();
  EXPECT_EQ(pool.node_count(), count);
}

// Statements are walked alone where a tree cannot reach a limit; both walks have to record the same.
TEST(HintWalk, AShortWalkRecordsWhatALongOneDoes) {
  for (const char* source :
       {"x: int = f(a)[b]", "def f(a: A, b: B) -> C: pass", "for x in y: z: int = 1", "if a: x: int = 1",
        "class C: x: int = 1", "case A(x): y: int = 1", "with a as b: x: int = 1", "try: x: int = 1", "return x",
        "del x", "else: x = 1  # type: int", "def f[T: (A, B)](x: T): pass"}) {
    CTypeHintWalker& walker = HintWalker();
    const auto hints = [&] { return HintRecords(Analyze(source)); };
    const Names quick = hints();
    const int32_t limit = walker.fMaxVisits;
    walker.fMaxVisits = 4 * walker.fMaxRecurseCount - 1;  // a statement may now reach a limit
    EXPECT_EQ(hints(), quick) << source;
    walker.fMaxVisits = limit;
  }
}

TEST(HintWalk, ATreeTooDeepPrintsItsLineAndTheAnalysisGoesOn) {
  const ConsoleCapture capture;
  std::string source = "x";
  for (int i = 0; i < 45; ++i) source = "[" + source + ", y]";
  EXPECT_EQ(Analyze(source).error, "");
  EXPECT_EQ(capture.PrintedLines().size(), 2u);  // one of each walker
  EXPECT_TRUE(capture.PrintedLines()[1].ends_with("Maximum recurse count in _VisitNode exceeded"));
}

// An engine of a host's may make a tree that the line says nothing of.
TEST(HintWalk, ATreeLargerThanItsLineReachesTheLimits) {
  const ConsoleCapture capture;
  LogicalLine line;
  HintWalker().Walk(Chain(40).root(), &line, false);
  EXPECT_EQ(capture.PrintedLines(), Names{});
  HintWalker().Walk(Chain(100000).root(), &line, false);
  const Ref<NodePool> pool(new NodePool);
  CNode* knot = pool->Construct(NodeKind::kCNode, nullptr);
  CNode** children = pool->ResizeChildren(knot, 300);
  CNode* bush = pool->Construct(NodeKind::kCNode, nullptr);
  CNode** twigs = pool->ResizeChildren(bush, 300);
  for (uint32_t i = 0; i < 300; ++i) {
    children[i] = bush;
    twigs[i] = pool->Construct(NodeKind::kCNode, nullptr);
    pool->ResizeChildren(twigs[i], 1)[0] = pool->Construct(NodeKind::kCNode, nullptr);
  }
  HintWalker().Walk(knot, &line, false);
  EXPECT_EQ(capture.PrintedLines(),
            (Names{"RuntimeError raised in CNodeWalker.Walk: Maximum recurse count in _VisitNode exceeded",
                   "RuntimeError raised in CNodeWalker.Walk: Maximum number of calls to _VisitNode exceeded"}));
  EXPECT_EQ(HintWalker().fVisitCount, 0);
}

// The row behind a text is counted as the host's splitlines does, the row of a comment by line ends.
TEST(EndingComments, AreFoundBehindTextsOfSeveralLines) {
  const std::pair<const char*, bool> texts[] = {
      {"'''a'''", true},
      {"'''a\nb'''", true},
      {"'''a\nb\n'''", true},
      {"'''\n\n'''", true},
      {"'''a\r\nb'''", true},
      {"'''a\rb\nc'''", true},
      {"'''a\n\rb'''", true},
      {"'''a\r\rb\nc'''", true},
      // Without a line feed a text counts as one line.
      {"'''a\rb'''", false},
      {"'''a\x0b''' ''", true},
      // These end lines to the host alone.
      {"'''a\x0b\nb'''", false},
      {"'''a\x0c\nb'''", false},
      {"'''a\x1c\nb'''", false},
      {"'''a\x1e\nb'''", false},
      {"'''a\xC2\x85\nb'''", false},
      {"'''a\xE2\x80\xA8\nb'''", false},
      {"'''a\xE2\x80\xA9\nb'''", false},
      {"'''a\x0e\nb'''", true},
      {"'''a\x09\nb'''", true},
      {"'''a\x1b\nb'''", true},
      {"'''a\x1f\nb'''", true},
      {"'''a\xC2\x84\nb'''", true},
      {"'''a\xC3\x85\nb'''", true},
      {"'''a\xE2\x80\xAA\nb'''", true},
      {"'''a\xE2\x81\xA8\nb'''", true},
      {"'''a\xE3\x80\xA8\nb'''", true},
  };
  for (const auto& [text, found] : texts) {
    const AnalyzedLine line = Analyze(std::string("x = ") + text + "  # type: str\n");
    EXPECT_EQ(line.error, "");
    EXPECT_EQ(HintRecords(line), found ? Names{"x str"} : Names{}) << text;
  }
}

TEST(HintWalk, TuplesNestToTheLimitOfTargets) {
  const auto reported = [](int depth) {
    const ConsoleCapture capture;
    std::string target = "x", hint = "int";
    for (int i = 0; i < depth; ++i) {
      target = "[" + target + ", y]";
      hint = "[" + hint + ", str]";
    }
    CTypeHintWalker& walker = HintWalker();
    const ParsedLine targets(target);
    const ParsedLine hints(hint);
    LogicalLine line;
    walker.fLogical = &line;
    std::string failure;
    try {
      walker.ProcessNameAndHintNodes(targets.root(), hints.root(), false);
    } catch (const Error& error) {
      failure = HostExceptionName(error.kind());
    }
    walker.fLogical = nullptr;
    return failure;
  };
  EXPECT_EQ(reported(400), "");
  EXPECT_EQ(reported(401), "RecursionError");
}

TEST(HintWalk, DeeplyNestedTuplesEndInALimit) {
  const ConsoleCapture capture;
  std::string target = "x";
  std::string hint = "int";
  for (int i = 0; i < 5000; ++i) {
    target = "(" + target + ",)";
    hint = "(" + hint + ",)";
  }
  EXPECT_EQ(Analyze(target + " = y  # type: " + hint).error, "");
}

}  // namespace
}  // namespace quillet
