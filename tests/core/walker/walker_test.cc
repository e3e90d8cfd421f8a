// The records of statements, family by family, and the frame of the walk.
#include "walker/walker.h"

#include <gtest/gtest.h>

#include <functional>

#include "foundations/console.h"
#include "lines/syntax_error.h"
#include "tests/core/support/analysis_helper.h"

namespace quillet {
namespace {

using testing::CutSource;
using testing::kPy2;
using testing::kPy3;
using testing::ParsedLine;
using testing::RecordsOf;
using testing::RecordStrings;

using Records = std::vector<std::string>;

std::vector<std::string>& PrintedLines() {
  static std::vector<std::string> lines;
  return lines;
}

// Collects what a walk prints.
class Printed {
 public:
  Printed() : before_(TheConsole().print_line) {
    PrintedLines().clear();
    TheConsole().print_line = [](Text line) {
      // Giving back a deep tree prints lines of its own.
      if (line != "depth too great") PrintedLines().emplace_back(line);
    };
  }
  ~Printed() { TheConsole().print_line = before_; }
  const std::vector<std::string>& lines() const { return PrintedLines(); }

 private:
  void (*before_)(Text);
};

// `count` times `text`.
std::string Times(int count, Text text) {
  std::string all;
  for (int i = 0; i < count; ++i) all += text;
  return all;
}

struct Case {
  Text source;
  Records records;
};

void Check(const std::vector<Case>& cases, Version version = kPy3) {
  CNodeWalker walker(version);
  for (const Case& one : cases) EXPECT_EQ(RecordsOf(walker, one.source, version), one.records) << one.source;
}

// ---- the frame ----

TEST(Frame, TenThousandVisitsPassAndOneMoreDoesNot) {
  const Printed printed;
  // Four visits for the atom, its brackets and the list, three for "x,1", two for each ",1".
  const std::string most = "[x,1" + Times(4996, ",1");
  EXPECT_EQ(RecordsOf(most + ",]"), Records{"x :g:"});
  EXPECT_TRUE(printed.lines().empty());
  EXPECT_EQ(RecordsOf(most + ",1]"), Records());
  EXPECT_EQ(printed.lines().size(), 1u);
}

TEST(Frame, VisitsAreCountedExactly) {
  // The sum and its five children.
  const Printed printed;
  CNodeWalker walker(kPy3);
  walker.fMaxVisits = 6;
  EXPECT_EQ(RecordsOf(walker, "a + b + 1"), (Records{"a :g:", "b :g:"}));
  EXPECT_TRUE(printed.lines().empty());
  walker.fMaxVisits = 5;
  EXPECT_EQ(RecordsOf(walker, "a + b + 1"), Records());
  ASSERT_EQ(printed.lines().size(), 1u);
  EXPECT_EQ(printed.lines()[0],
            "RuntimeError raised in CNodeWalker.Walk: RuntimeError('Maximum number of calls to _VisitNode exceeded')");
}

TEST(Frame, TheLimitsAreTenThousandAndForty) {
  const CNodeWalker walker(kPy3);
  EXPECT_EQ(walker.fMaxVisits, 10000);
  EXPECT_EQ(walker.fMaxRecurseCount, 40);
}

TEST(Frame, ADepthOfFortyPassesAndOneMoreDoesNot) {
  const Printed printed;
  // Each pair of brackets is one level, and the name inside the last one more.
  const auto nested = [](int depth) { return Times(depth, "[") + "x" + Times(depth, "]"); };
  EXPECT_EQ(RecordsOf(nested(39)), Records{"x :g:"});
  EXPECT_TRUE(printed.lines().empty());
  EXPECT_EQ(RecordsOf(nested(40)), Records());
  ASSERT_EQ(printed.lines().size(), 1u);
  EXPECT_EQ(printed.lines()[0],
            "RuntimeError raised in CNodeWalker.Walk: RuntimeError('Maximum recurse count in _VisitNode exceeded')");
}

TEST(Frame, ALimitDropsReadsButKeepsDirectRecordsAndLeavesTheWalkerIdle) {
  const Printed printed;
  CNodeWalker walker(kPy3);
  const std::string deep = Times(50, "[") + "y" + Times(50, "]");
  const Records records = RecordsOf(walker, "x = f(z, " + deep + ")");
  ASSERT_EQ(records.size(), 2u);
  EXPECT_EQ(records[0], "x :s:");
  EXPECT_EQ(printed.lines().size(), 1u);
  EXPECT_EQ(walker.fVisitCount, 0);
  EXPECT_EQ(walker.fRecurseCount, 0);
  EXPECT_EQ(walker.fLogical, nullptr);
  EXPECT_TRUE(walker.fLoadedNames.empty());
  EXPECT_TRUE(walker.fStoredNames.empty());
  EXPECT_EQ(RecordsOf(walker, "a"), Records{"a :g:"});
}

TEST(Frame, ASyntaxErrorLeavesTheWalkerIdle) {
  CNodeWalker walker(kPy3);
  EXPECT_EQ(RecordsOf(walker, "f(a, b for b in c)"),
            Records{"SyntaxError 1:6 Generator expression must be parenthesized if not sole argument"});
  EXPECT_EQ(walker.fLogical, nullptr);
  EXPECT_EQ(RecordsOf(walker, "a"), Records{"a :g:"});
}

TEST(Frame, WithoutANodeNothingHappens) {
  CNodeWalker walker(kPy3);
  LogicalLine line;
  walker.Walk(nullptr, &line);
  EXPECT_TRUE(line.type_equivs().empty());
  EXPECT_EQ(walker.fLogical, nullptr);
}

// A host's line that calls back into the walker, or fails.
class Hooks : public LineHooks {
 public:
  int GetTokType(LogicalLine& line, int64_t index) override { return line.toks[static_cast<size_t>(index)].code; }
  void AppendTypeEquiv(LogicalLine&, Text name, Text equiv) override {
    records.push_back(std::string(name).append(" ").append(equiv));
    if (on_record) on_record();
  }
  void AppendArgTypeEquiv(LogicalLine&, Text name, Text info) override {
    records.push_back(std::string("arg: ").append(name).append(" ").append(info));
  }
  void SetParsed(LogicalLine& line, bool parsed) override { line.parsed = parsed; }
  void ClearDerivedInfo(LogicalLine& line) override { line.DirectClearDerivedInfo(); }
  EmbeddedLines GetExpLogicals(LogicalLine&) override { return {}; }
  void CopyTypeEquivs(LogicalLine&, LogicalLine&) override {}
  bool GetHostArgRecords(LogicalLine&, std::vector<std::pair<std::string, std::string>>&) override { return false; }
  bool GetHostTokTypes(LogicalLine&, std::vector<int32_t>&) override { return false; }

  std::function<void()> on_record;
  Records records;
};

TEST(Frame, AWalkInsideAWalkIsAValueErrorAndDisturbsNothing) {
  CNodeWalker walker(kPy3);
  const ParsedLine other("b");
  const ParsedLine line("def f(a, b=1, *c): pass");
  Hooks hooks;
  int refused = 0;
  hooks.on_record = [&] {
    try {
      walker.Walk(other.root(), &other.line());
    } catch (const Error& error) {
      EXPECT_EQ(error.kind(), ErrorKind::kValueError);
      EXPECT_EQ(error.message(), "Only one logical may be walked at a time");
      ++refused;
    }
  };
  line.line().hooks = &hooks;
  walker.Walk(line.root(), &line.line());
  EXPECT_EQ(refused, 1);
  EXPECT_EQ(hooks.records,
            (Records{"f :s:", "arg: a :s:", "arg: b :s:", "arg: b :l:int: 1", "arg: c :s:", "arg: c :l:tuple:"}));
}

TEST(Frame, AHostsOverridesGetTheSameRecords) {
  for (const Text source :
       {"x = a . b(c)[0] . d", "f(a+b, 'x y')", "[i for i in j]", "import a . b", "a, (b, c) = f()"}) {
    const ParsedLine line(source);
    Hooks hooks;
    CNodeWalker walker(kPy3);
    walker.Walk(line.root(), &line.line());
    line.line().hooks = &hooks;
    walker.Walk(line.root(), &line.line());
    EXPECT_EQ(hooks.records, RecordStrings(line.line())) << source;
  }
}

TEST(Frame, AHostsOverridesGetWhatOthersAppend) {
  const ParsedLine line("x");
  Hooks hooks;
  line.line().hooks = &hooks;
  line.line().AppendTypeEquiv("x", ":g:");
  line.line().AppendArgTypeEquiv("y", ":s:");
  EXPECT_EQ(hooks.records, (Records{"x :g:", "arg: y :s:"}));
}

TEST(Frame, OtherFailuresPassThroughAndLeaveTheWalkerIdle) {
  CNodeWalker walker(kPy3);
  const ParsedLine line("x = y");
  Hooks hooks;
  hooks.on_record = [] { ThrowError(ErrorKind::kTypeError, "no"); };
  line.line().hooks = &hooks;
  EXPECT_THROW(walker.Walk(line.root(), &line.line()), Error);
  EXPECT_EQ(walker.fLogical, nullptr);
  EXPECT_EQ(walker.fVisitCount, 0);
}

TEST(Frame, AnyRuntimeErrorFromBelowIsPrinted) {
  const Printed printed;
  CNodeWalker walker(kPy3);
  const ParsedLine line("x = y");
  Hooks hooks;
  hooks.on_record = [] { ThrowError(ErrorKind::kRecursionError, "too deep"); };
  line.line().hooks = &hooks;
  walker.Walk(line.root(), &line.line());
  EXPECT_EQ(printed.lines(), Records{"RuntimeError raised in CNodeWalker.Walk: RecursionError('too deep')"});
  EXPECT_EQ(walker.fLogical, nullptr);
}

TEST(Frame, RecordersOutsideOfAWalkAreAnAttributeError) {
  CNodeWalker walker(kPy3);
  for (const auto& record : std::vector<std::function<void()>>{
           [&] { walker.AddTypeEquiv("a", "b"); }, [&] { walker.AddArgInfoBytes("a", "b"); },
           [&] { walker.AddNameDefined("a"); }, [&] { walker.AddArgNameDefined("a"); }}) {
    try {
      record();
      FAIL();
    } catch (const Error& error) {
      EXPECT_EQ(error.kind(), ErrorKind::kAttributeError);
    }
  }
}

TEST(Frame, LanguageModeFollowsTheVersion) {
  const auto py3 = [](int count, int major, int minor, int micro) {
    return CNodeWalker(Version{{major, minor, micro}, count}).fPy3;
  };
  EXPECT_FALSE(py3(2, 2, 7, 0));
  EXPECT_FALSE(py3(3, 2, 7, 18));
  EXPECT_TRUE(py3(2, 3, 0, 0));
  EXPECT_TRUE(py3(3, 3, 8, 1));
  // A tuple of one element is less than (3, 0).
  EXPECT_FALSE(py3(1, 3, 0, 0));
}

TEST(Frame, RaiseIfNotInstanceTellsClassAndNode) {
  const CNodeWalker walker(kPy3);
  const ParsedLine line("a.b");
  walker.RaiseIfNotInstance(line.root(), NodeKind::kCAtomExpr);
  walker.RaiseIfNotInstance(line.root(), NodeKind::kCExpression);
  walker.RaiseIfNotInstance(line.root(), NodeKind::kCNode);
  try {
    walker.RaiseIfNotInstance(line.root(), NodeKind::kCAtom);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kValueError);
    EXPECT_EQ(error.message(), "Node is not a <class 'quillet.tarvex.CAtom'>: " + ReprOfNode(line.root()));
  }
}

TEST(Frame, TextsThatWouldFillTheMemoryEndTheWalk) {
  const Printed printed;
  // Every one of ten thousand names would get a copy of a text of ten thousand bytes.
  const std::string value = "f(" + Times(1000, "'abcd', ") + "1)";
  const Records records = RecordsOf(Times(20000, "a,") + " = " + value);
  EXPECT_LT(records.size(), 40000u);
  ASSERT_EQ(printed.lines().size(), 1u);
  EXPECT_NE(printed.lines()[0].find("Maximum size of the texts of a statement exceeded"), std::string::npos);
}

TEST(Frame, RecordsOutliveATreeOfAnotherSource) {
  LogicalLine line;
  {
    const ParsedLine hint("x = [List[a.b], f(c) .d]");
    CNodeWalker walker(kPy3);
    walker.Walk(hint.root(), &line);
  }
  EXPECT_EQ(RecordStrings(line), (Records{"x :s:", "x :l:list:", "f :c:(c)",
                                          "List :g:", "a :g:", "a.b :g:", "f :g:", "c :g:", "f(c).d :g:"}));
}

TEST(Frame, AHookMayAddNamesWhileTheReadsAreRecorded) {
  const ParsedLine line("a + b");
  CNodeWalker walker(kPy3);
  Hooks hooks;
  int added = 0;
  hooks.on_record = [&] {
    if (++added <= 20) walker.ProcessLoadName("added" + std::to_string(added));
  };
  line.line().hooks = &hooks;
  walker.Walk(line.root(), &line.line());
  EXPECT_EQ(hooks.records.size(), 22u);
  EXPECT_EQ(hooks.records.back(), "added20 :g:");
}

// ---- names ----

TEST(Names, ReadsComeOnceAndInOrderOfFirstArrival) {
  Check({
      {"x + x", {"x :g:"}},
      {"b + a + b", {"b :g:", "a :g:"}},
      {"None, True, False", {}},
      {"1 if a else b", {"a :g:", "b :g:"}},
  });
  Check({{"None, True, False", {}}}, kPy2);
}

TEST(Names, ManyNamesAreFoundAgain) {
  std::string sum;
  Records expected;
  for (int i = 0; i < 300; ++i) {
    const std::string name = "a_rather_long_name_" + std::to_string(i);
    sum += name + " + ";
    expected.push_back(name + " :g:");
  }
  EXPECT_EQ(RecordsOf(sum + sum + "1"), expected);
}

TEST(Names, ChainsAreReadLinkByLink) {
  Check({
      {"f(a.b.c)", {"f :c:(a.b.c)", "f :g:", "a :g:", "a.b :g:", "a.b.c :g:"}},
      {"a().b", {"a :g:", "a().b :g:"}},
      {"a[i].b", {"a :g:", "i :g:", "a[i].b :g:"}},
      {"'s'.join(x)", {"'s'.join :g:", "x :g:"}},
      {"(a + b).c", {"a :g:", "b :g:", "(a + b).c :g:"}},
      {"(a).b", {"a :g:", "(a).b :g:"}},
      {"a.b ** c.d", {"a :g:", "a.b :g:", "c :g:", "c.d :g:"}},
      {"f(x)(y).z", {"f :c:(x)", "f :g:", "x :g:", "y :g:", "f(x)(y).z :g:"}},
  });
  Check({{"a.b ** c.d", {"a :g:", "a.b :g:", "c :g:", "c.d :g:"}}}, kPy2);
}

TEST(Names, LinksApartInTheSourceAreJoined) {
  Check({
      {"(a .\n b # c\n .c . d)", {"a :g:", "a.b :g:", "a.b.c :g:", "a.b.c.d :g:"}},
      {"a .b(c) .d", {"a.b :c:(c)", "a :g:", "a.b :g:", "c :g:", "a.b(c).d :g:"}},
      {"( a+b )[ c + d ].e", {"a :g:", "b :g:", "c :g:", "d :g:", "(a + b)[c + d].e :g:"}},
      {"( a+b )[ c*d ].e[ f+g ].h = 1",
       {"(a + b)[c * d].e[f + g].h :l:int: 1", "c :g:", "d :g:", "(a + b)[c * d].e :g:", "f :g:", "g :g:"}},
      {"a(b,c).d.e", {"a :c:(b,c)", "a :g:", "b :g:", "c :g:", "a(b, c).d :g:", "a(b, c).d.e :g:"}},
  });
}

TEST(Names, AStoredChainReadsAllLinksButTheLast) {
  Check({
      {"a.b.c = 1", {"a.b.c :s:", "a.b.c :l:int: 1", "a :g:", "a.b :g:"}},
      {"a[i].b = 1", {"a[i].b :l:int: 1", "a :g:", "i :g:"}},
      {"a[i] = 1", {"a[i] :l:int: 1", "a :g:", "i :g:"}},
      {"x = 1", {"x :s:", "x :l:int: 1"}},
  });
}

TEST(Names, ComprehensionTargetsAreStoresInTheirScope) {
  Check({
      {"[x for x in y]", {"x :g:", "y :g:", "x :w:3"}},
      {"[x for x in y for x in z]", {"x :g:", "y :g:", "z :g:", "x :w:3", "x :w:7"}},
      {"{k: v for k, v in d.items() if k}", {"k :g:", "v :g:", "d :g:", "d.items :g:", "k :w:5", "v :w:7"}},
      {"[a.b for a.b in c]", {"a :g:", "a.b :g:", "c :g:", "a.b :w:7"}},
      {"a[[i for i in j]] = 1", {"a[[i for i in j]] :l:int: 1", "a :g:", "i :g:", "j :g:", "i :w:5"}},
  });
  Check({{"[x for x in y]", {"x :g:", "y :g:", "x :w:3"}}}, kPy2);
}

TEST(Names, ACallWithoutArgumentsIsNoCalledRecord) {
  Check({{"f()", {"f :g:"}}, {"a.f().g()", {"a :g:", "a.f :g:", "a.f().g :g:"}}});
}

TEST(Names, AwaitIsNoName) { Check({{"await a.b", {"a :g:", "a.b :g:"}}, {"x = await a", {"x :s:", "x a", "a :g:"}}}); }

TEST(Names, AStoreWithoutATokenIndexIsATypeError) {
  const ParsedLine line("[x for x in y]");
  auto* clause = line.Find<CCompForNode>();
  ASSERT_NE(clause, nullptr);
  clause->GetTargetNode()->fContext = Context::At({0, 3});
  CNodeWalker walker(kPy3);
  try {
    walker.Walk(line.root(), &line.line());
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kTypeError);
  }
}

TEST(Names, AHostAsksForOneLinkByItsTrailers) {
  const ParsedLine line("a.b(c).d");
  auto* chain = line.Find<CAtomExpr>();
  CNodeWalker walker(kPy3);
  const NodeSpan trailers = chain->TrailerSpan();
  walker.VisitNameLiteral(trailers[0]->children[1], chain->GetAtom(), trailers, 0, true);
  walker.VisitNameLiteral(trailers[2]->children[1], chain->GetAtom(), trailers, 2, true);
  walker.VisitNameLiteral(chain->GetAtom(), nullptr, {}, -1, false);
  ASSERT_EQ(walker.fLoadedNames.size(), 3u);
  EXPECT_EQ(walker.fLoadedNames[0], "a.b");
  EXPECT_EQ(walker.fLoadedNames[1], "a.b(c).d");
  EXPECT_EQ(walker.fLoadedNames[2], "a");
}

// ---- imports ----

TEST(Imports, BindWhatTheyName) {
  Check({
      {"import a", {"a :s:", "a :i:a"}},
      {"import a.b.c", {"a :s:", "a :i:a"}},
      {"import a.b as c", {"c :s:", "c :i:a.b", "c :a:c"}},
      {"import a, b", {"a :s:", "a :i:a", "b :s:", "b :i:b"}},
      {"import a . b", {"a :s:", "a :i:a"}},
      {"import a . b as c, d", {"c :s:", "c :i:a.b", "c :a:c", "d :s:", "d :i:d"}},
      {"from a import b", {"b :s:", "b :f:a b"}},
      {"from a import b as c", {"c :s:", "c :f:a b", "c :a:c"}},
      {"from a.b import (c, d as e,)", {"c :s:", "c :f:a.b c", "e :s:", "e :f:a.b d", "e :a:e"}},
      {"from . import x", {"x :s:", "x :f:. x"}},
      {"from ..a import x", {"x :s:", "x :f:..a x"}},
      {"from ... import x", {"x :s:", "x :f:... x"}},
      {"from a import *", {"* :f:a *"}},
  });
}

// A host's trees.
TEST(Imports, OfNamesWithoutPartsOrInPieces) {
  const ParsedLine line("import a.b as c");
  CDottedName* const name = line.Find<CDottedName>();
  ASSERT_NE(name, nullptr);
  CNode* const inner = name->pool->Construct(NodeKind::kCDottedName, nullptr);
  std::copy_n(name->children, 3, name->pool->ResizeChildren(inner, 3));
  name->pool->ResizeChildren(name, 1)[0] = inner;
  CNodeWalker(kPy3).Walk(line.root(), &line.line());
  EXPECT_EQ(RecordStrings(line.line()), (Records{"c :s:", "c :i:a.b", "c :a:c"}));
  name->pool->ClearChildren(inner);
  line.line().ClearDerivedInfo();
  CNodeWalker(kPy3).Walk(line.root(), &line.line());
  EXPECT_EQ(RecordStrings(line.line()), (Records{"c :s:", "c :i:", "c :a:c"}));
  name->pool->ClearChildren(name);
  line.line().ClearDerivedInfo();
  CNodeWalker(kPy3).Walk(line.root(), &line.line());
  EXPECT_EQ(RecordStrings(line.line()), (Records{"c :s:", "c :i:", "c :a:c"}));
}

// ---- definitions ----

TEST(Definitions, OfFunctions) {
  Check({
      {"def f(a, b=1, *c, **d) -> R: pass",
       {"f :s:", "R :g:", "arg: a :s:", "arg: b :s:", "arg: b :l:int: 1",
        "arg: c :s:", "arg: c :l:tuple:", "arg: d :s:", "arg: d :l:dict:"}},
      {"def f(a: T = x): pass", {"f :s:", "x :g:", "T :g:", "arg: a :s:", "arg: a x"}},
      {"def f(): pass", {"f :s:"}},
      {"def f(a, *, b=None): pass", {"f :s:", "arg: a :s:", "arg: b :s:", "arg: b :l:None: None"}},
      {"def f(a, /, b): pass", {"f :s:", "arg: a :s:", "arg: b :s:"}},
      {"def f(*args: T, **kw: U): pass",
       {"f :s:", "T :g:", "U :g:", "arg: args :s:", "arg: args :l:tuple:", "arg: kw :s:", "arg: kw :l:dict:"}},
      {"def f(a=lambda b=c: b): pass", {"f :s:", "c :g:", "b :g:", "b :w:6", "arg: a :s:"}},
  });
}

TEST(Definitions, OfTupleParameters) {
  Check({{"def f((a, b), c): pass", {"f :s:", "arg: a :s:", "arg: b :s:", "arg: c :s:"}},
         {"def f(a, (b, (c, d))=e): pass", {"f :s:", "arg: a :s:", "arg: b :s:", "arg: c :s:", "arg: d :s:"}},
         {"lambda (a, b), c: a", {"a :g:", "a :w:2", "b :w:4", "c :w:7"}}},
        kPy2);
}

TEST(Definitions, DeeplyNestedTupleParametersAreWalkedWithoutRecursion) {
  const int depth = 20000;
  EXPECT_EQ(RecordsOf("def f(" + Times(depth, "(") + "a" + Times(depth, ",)") + "): pass", kPy2),
            (Records{"f :s:", "arg: a :s:"}));
}

TEST(Definitions, LambdaParametersAreStoresInsideTheExpression) {
  Check({
      {"lambda a, b=y: a + b", {"y :g:", "a :g:", "b :g:", "a :w:1", "b :w:3"}},
      {"lambda: x", {"x :g:"}},
      {"lambda *a, **k: 0", {"a :w:2", "k :w:5"}},
  });
}

TEST(Definitions, OfClasses) {
  Check({
      {"class C(B, metaclass=M): pass", {"C :s:", "B :g:", "M :g:"}},
      {"class C: pass", {"C :s:"}},
      {"class C(): pass", {"C :s:"}},
      {"class C(a.B, *Bs): pass", {"C :s:", "a :g:", "a.B :g:", "Bs :g:"}},
  });
}

TEST(Definitions, DecoratorsAreCalls) {
  Check({
      {"@a.b(1)", {"a.b :c:(1)", "a :g:", "a.b :g:"}},
      {"@a.b", {"a.b :c:()", "a :g:", "a.b :g:"}},
      {"@a()", {"a :c:()", "a :g:"}},
      {"@a . b (c)", {"a.b :c:(c)", "a :g:", "a.b :g:", "c :g:"}},
      {"@f(x, y for y in z)", {"SyntaxError 1:7 Generator expression must be parenthesized if not sole argument"}},
  });
}

TEST(Definitions, GlobalAndNonlocal) { Check({{"global a, b", {"a :G:", "b :G:"}}, {"nonlocal a", {"a :N:"}}}); }

// ---- assignments ----

TEST(Assignments, PairTargetsWithValues) {
  Check({
      {"a, b = 1, 2", {"a :s:", "a :l:int: 1", "b :s:", "b :l:int: 2"}},
      {"a, b = f()", {"a :s:", "a f()[0]", "b :s:", "b f()[1]", "f :g:"}},
      {"[a, b] = [1, 2]", {"a :s:", "a :l:int: 1", "b :s:", "b :l:int: 2"}},
      {"(a, b), c = f()", {"a :s:", "a f()[0][0]", "b :s:", "b f()[0][1]", "c :s:", "c f()[1]", "f :g:"}},
      {"(a, b), c = (1, 2), 3", {"a :s:", "a :l:int: 1", "b :s:", "b :l:int: 2", "c :s:", "c :l:int: 3"}},
      {"a, b = *c, d", {"a :s:", "b :s:", "b d", "c :g:", "d :g:"}},
  });
}

TEST(Assignments, ValuesTooShortLeaveADefinition) {
  Check({{"a, b, c = 1, 2", {"a :s:", "a :l:int: 1", "b :s:", "b :l:int: 2", "c :s:"}}});
}

TEST(Assignments, AStarredTargetIsAList) {
  Check({
      {"a, *b = x", {"a :s:", "a x[0]", "b :s:", "b :l:list:", "x :g:"}},
      {"*a.b, c = x", {"a.b :s:", "a.b :l:list:", "c :s:", "c x[1]", "a :g:", "x :g:"}},
  });
}

TEST(Assignments, ANameInParenthesesBindsNothing) {
  Check({{"(a) = 1", {}}, {"((a)) = 1", {}}, {"[a] = x", {"a :s:", "a x[0]", "x :g:"}}});
}

TEST(Assignments, ToSeveralTargets) {
  Check({
      {"a = b = f(x)", {"a :s:", "a f(x)", "b :s:", "b f(x)", "f :c:(x)", "f :g:", "x :g:"}},
      {"self.x = 1", {"self.x :s:", "self.x :l:int: 1", "self :g:"}},
      {"x = yield y", {"x :s:", "yield y", "y :g:"}},
  });
}

TEST(Assignments, AugmentedOnesOnlyRead) {
  Check({{"x += 1", {"x :g:"}}, {"x |= y", {"x :g:", "y :g:"}}, {"a.b -= c", {"a :g:", "a.b :g:", "c :g:"}}});
}

TEST(Assignments, AnnotatedOnesDefineWithAValue) {
  Check({
      {"x: int", {"int :g:"}},
      {"x: int = 1", {"x :s:", "x :l:int: 1", "int :g:"}},
      {"a.b: T = c", {"a.b :s:", "a.b c", "a :g:", "T :g:", "c :g:"}},
  });
}

TEST(Assignments, OfForStatements) {
  Check({
      {"for a, b in x: pass", {"a :s:", "a x[*][0]", "b :s:", "b x[*][1]", "x :g:"}},
      {"for a in f(x): y", {"f :c:(x)", "a :s:", "a f(x)[*]", "f :g:", "x :g:", "y :g:"}},
      {"for a.b in [1]: pass", {"a.b :s:", "a :g:"}},
  });
}

TEST(Assignments, OfWithStatements) {
  Check({
      {"with f() as (a, b): pass", {"a :s:", "a f()[0]", "b :s:", "b f()[1]", "f :g:"}},
      {"with f(x) as y: pass", {"y :s:", "y f(x)", "f :c:(x)", "f :g:", "x :g:"}},
      {"with a: pass", {"a :g:"}},
      // The target is not walked.
      {"with a as b[c]: pass", {"b[c] a", "a :g:"}},
  });
}

TEST(Assignments, OfExceptClauses) {
  Check({
      {"except E: pass", {"E :g:"}},
      {"except: pass", {}},
      {"except E as e: pass", {"e :s:", "e E:", "E :g:"}},
      {"except (A, b.B) as e: pass", {"e :s:", "e A:", "e b.B:", "A :g:", "b :g:", "b.B :g:"}},
      {"except (A, f()) as e: pass", {"e :s:", "e A:", "A :g:", "f :g:"}},
      {"except f() as e: pass", {"e :s:", "f :g:"}},
  });
}

TEST(Assignments, TheOlderExceptTakesASimpleNameOnly) {
  Check({{"except E, e: pass", {"e :s:", "e E:", "E :g:"}},
         {"except E, a.b: pass", {"SyntaxError 1:11 Name in except clause must be a simple name"}},
         {"except E, (a, b): pass", {"SyntaxError 1:11 Name in except clause must be a simple name"}}},
        kPy2);
}

TEST(Assignments, OfNamedExpressions) {
  Check({
      {"if (y := f(x)): pass", {"y :s:", "y f(x)", "f :c:(x)", "f :g:", "x :g:"}},
      {"f(y := 1)", {"y :s:", "y :l:int: 1", "f :c:(y := 1)", "f :g:"}},
  });
}

TEST(Assignments, ANamedExpressionOfAnotherClassIsAnAssertion) {
  const ParsedLine line("a");
  CNodeWalker walker(kPy3);
  try {
    walker.VisitNamedExpr(line.root());
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kAssertionError);
  }
}

// A host's tree.
TEST(Names, ADottedNameHasPartsWithTexts) {
  const Ref<NodePool> pool(new NodePool);
  const Printed printed;
  CNode* const name = pool->Construct(NodeKind::kCDottedName, nullptr);
  CNode* const part = pool->Construct(NodeKind::kCAtom, nullptr);
  pool->ResizeChildren(part, 1)[0] = pool->Construct(NodeKind::kCAtom, nullptr);
  for (CNode* const child : {part, static_cast<CNode*>(nullptr)}) {
    pool->ResizeChildren(name, 1)[0] = child;
    EXPECT_THROW(CNodeWalker(kPy3).VisitDottedName(static_cast<CDottedName*>(name)), Error);
  }
}

// A host's tree; the pattern parser stops earlier.
TEST(Patterns, MayNestToTheLimit) {
  const auto walk = [](int levels) {
    const Ref<NodePool> pool(new NodePool);
    CNode* node = pool->Construct(NodeKind::kCPatternNode, nullptr);
    CNode* const root = node;
    while (--levels > 0) {
      CNode* child = pool->Construct(NodeKind::kCPatternNode, nullptr);
      pool->ResizeChildren(node, 1)[0] = child;
      node = child;
    }
    CNodeWalker(kPy3).VisitPatternNode(root);
  };
  EXPECT_NO_THROW(walk(CNodeWalker::kMaxPatternDepth));
  EXPECT_THROW(walk(CNodeWalker::kMaxPatternDepth + 1), Error);
}

TEST(Assignments, ATargetMayNestToTheLimit) {
  const Printed printed;
  CNodeWalker walker(kPy3);
  walker.fMaxRecurseCount = 10'000;
  const auto nested = [](int depth) {
    std::string target = "a";
    for (int i = 0; i < depth; ++i) target = "[" + target + ", b]";
    return target + " = x";
  };
  const auto reads_x = [&](int depth) {
    const Records records = RecordsOf(walker, nested(depth));
    return !records.empty() && records.back() == "x :g:";
  };
  EXPECT_TRUE(reads_x(CNodeWalker::kMaxTargetDepth));
  EXPECT_TRUE(printed.lines().empty());
  EXPECT_FALSE(reads_x(CNodeWalker::kMaxTargetDepth + 1));
  EXPECT_EQ(printed.lines(), Records{"RuntimeError raised in CNodeWalker.Walk: RecursionError('maximum recursion depth "
                                     "exceeded while unpacking a target')"});
}

TEST(Assignments, ATargetNestedTooDeepEndsTheWalk) {
  const Printed printed;
  std::string target = "a";
  for (int i = 0; i <= CNodeWalker::kMaxTargetDepth; ++i) target = "(" + target + ", b)";
  const Records records = RecordsOf(target + " = x");
  EXPECT_FALSE(records.empty() && printed.lines().empty());
  ASSERT_EQ(printed.lines().size(), 1u);
  EXPECT_NE(printed.lines()[0].find("RecursionError"), std::string::npos);
}

// ---- calls, returns, yields ----

TEST(Calls, TellTheirPositionalArguments) {
  Check({
      {"f(a, 1)", {"f :c:(a,1)", "f :g:", "a :g:"}},
      {"f(a+b, [c])", {"f :c:(a + b,[c])", "f :g:", "a :g:", "b :g:", "c :g:"}},
      {"a.b(1)", {"a.b :c:(1)", "a :g:", "a.b :g:"}},
      {"(a)(1)", {"a :c:(1)", "a :g:"}},
      {"f(a,)", {"f :c:(a)", "f :g:", "a :g:"}},
      {"f(g(1))", {"g :c:(1)", "f :c:(g(1))", "f :g:", "g :g:"}},
  });
}

TEST(Calls, WithKeywordsOrStarsTellNothing) {
  Check({
      {"f(a, b=1)", {"f :g:", "a :g:"}},
      {"f(a, *b)", {"f :g:", "a :g:", "b :g:"}},
      {"f(a, **b)", {"f :g:", "a :g:", "b :g:"}},
      {"f(a=b)", {"f :g:", "b :g:"}},
  });
  Check({{"f(*a)", {"f :g:", "a :g:"}}, {"f(a, *b)", {"f :g:", "a :g:", "b :g:"}}}, kPy2);
}

TEST(Calls, ALoneStarArgumentIsShownUnderTheNewerGrammar) { Check({{"f(*a)", {"f :c:(*a)", "f :g:", "a :g:"}}}); }

TEST(Calls, OfWhatIsNoDottedNameTellNothing) {
  Check({{"a[0](1)", {"a :g:"}}, {"f()(x)", {"f :g:", "x :g:"}}, {"f(x)(y)", {"f :c:(x)", "f :g:", "x :g:", "y :g:"}}});
}

TEST(Calls, AGeneratorMustBeParenthesizedUnlessAlone) {
  const std::string message = " Generator expression must be parenthesized if not sole argument";
  Check({
      {"f(x for x in y)", {"f :c:(x for x in y)", "f :g:", "x :g:", "y :g:", "x :w:4"}},
      {"f(x for x in y, 1)", {"SyntaxError 1:3" + message}},
      {"f(1, x for x in y)", {"SyntaxError 1:6" + message}},
      // What was recorded before stays.
      {"f(g(1), x for x in y)", {"g :c:(1)", "SyntaxError 1:9" + message}},
      {"f(1, (x for x in y))", {"f :c:(1,(x for x in y))", "f :g:", "x :g:", "y :g:", "x :w:7"}},
  });
}

TEST(Calls, IsinstanceTellsTheClassOfAName) {
  Check({
      {"isinstance(x, C)", {"x C:", "isinstance :c:(x,C)", "isinstance :g:", "x :g:", "C :g:"}},
      {"isinstance(x.y, (A, b.B))",
       {"x.y A:", "x.y b.B:", "isinstance :c:(x.y,(A, b.B))",
        "isinstance :g:", "x :g:", "x.y :g:", "A :g:", "b :g:", "b.B :g:"}},
      {"isinstance(x, (A, f()))", {"x A:", "isinstance :c:(x,(A, f()))", "isinstance :g:", "x :g:", "A :g:", "f :g:"}},
  });
}

TEST(Calls, IsinstanceOfAnythingElseTellsNothing) {
  Check({
      {"isinstance(f(), C)", {"isinstance :c:(f(),C)", "isinstance :g:", "f :g:", "C :g:"}},
      {"isinstance(x, C, D)", {"isinstance :c:(x,C,D)", "isinstance :g:", "x :g:", "C :g:", "D :g:"}},
      {"isinstance(x, cls=C)", {"isinstance :g:", "x :g:", "C :g:"}},
      {"isinstance(x, *C)", {"isinstance :g:", "x :g:", "C :g:"}},
      {"b.isinstance(x, C)", {"b.isinstance :c:(x,C)", "b :g:", "b.isinstance :g:", "x :g:", "C :g:"}},
  });
  // In the older grammar the stars are leaves beside the class.
  Check({{"isinstance(x, *C)", {"isinstance :g:", "x :g:", "C :g:"}},
         {"isinstance(x, **C)", {"isinstance :g:", "x :g:", "C :g:"}},
         {"isinstance(*x)", {"isinstance :g:", "x :g:"}}},
        kPy2);
}

TEST(Results, AreRecordedUnderReservedNames) {
  Check({
      {"return", {}},
      {"return 1", {"return :l:int: 1"}},
      {"return a, b", {"return :l:tuple: (a, b)", "a :g:", "b :g:"}},
      {"return a ** b", {"a :g:", "b :g:"}},
      {"yield", {}},
      {"yield a ** b", {"yield ", "a :g:", "b :g:"}},
      {"yield x", {"yield x", "x :g:"}},
      {"yield from x", {"yield from x", "x :g:"}},
      {"yield from f(a).b", {"f :c:(a)", "yield from f(a).b", "f :g:", "a :g:", "f(a).b :g:"}},
  });
}

// ---- equivalents ----

std::string EquivOf(Text source, Text trailer = kNoText, Version version = kPy3, bool with_text = true) {
  CNodeWalker walker(version);
  walker.fIncludeExprText = with_text;
  const ParsedLine line(source, version);
  const Text equiv = walker.TypeEquivForNode(line.root(), trailer);
  return IsNone(equiv) ? "<none>" : std::string(equiv);
}

TEST(Equivs, OfLiterals) {
  const std::vector<std::pair<Text, Text>> cases = {
      {"1", ":l:int: 1"},
      {"1.5", ":l:float: 1.5"},
      {"-1", ":l:int: -1"},
      {"+1.0", ":l:float: +1.0"},
      {"'x'", ":l:str: 'x'"},
      {"b'x'", ":l:bytes: b'x'"},
      {"None", ":l:None: None"},
      {"True", ":l:bool: True"},
      {"False", ":l:bool: False"},
      {"[1, 2]", ":l:list: [1, 2]"},
      {"[a]", ":l:list:"},
      {"{}", ":l:dict: {}"},
      {"{1: 2}", ":l:dict: {1: 2}"},
      {"{1, 2}", ":l:set: {1, 2}"},
      {"(1, 2)", ":l:tuple: (1, 2)"},
      {"1, 2", ":l:tuple: (1, 2)"},
      {"1,", ":l:tuple: (1,)"},
      {"((a, b))", ":l:tuple: (a, b)"},
      {"()", ":l:tuple: ( )"},
      {"[x for x in y]", ":l:list:"},
      {"{x: x for x in y}", ":l:dict:"},
  };
  for (const auto& [source, equiv] : cases) EXPECT_EQ(EquivOf(source), equiv) << source;
}

TEST(Equivs, OfLiteralsHaveNoParts) {
  for (const Text source : {"1", "-1", "'x'", "None", "True", "[1]", "{}", "(a, b)", "a, b", "'a' 'b'", "()"}) {
    EXPECT_EQ(EquivOf(source, "[0]"), "<none>") << source;
  }
}

TEST(Equivs, OfStringsFollowTheLanguage) {
  EXPECT_EQ(EquivOf("u'x'"), ":l:str: u'x'");
  EXPECT_EQ(EquivOf("u'x'", kNoText, kPy2), ":l:unicode: u'x'");
  EXPECT_EQ(EquivOf("'x'", kNoText, kPy2), ":l:str: 'x'");
  EXPECT_EQ(EquivOf("b'x'", kNoText, kPy2), ":l:bytes: b'x'");
}

TEST(Equivs, OfStringsSideBySideHaveNoText) {
  EXPECT_EQ(EquivOf("'a' 'b'"), ":l:str:");
  EXPECT_EQ(EquivOf("b'a' b'b'"), ":l:bytes:");
  EXPECT_EQ(EquivOf("u'a' 'b'", kNoText, kPy2), ":l:unicode:");
}

TEST(Equivs, WithoutExpressionTextOnlyWordsKeepTheirs) {
  EXPECT_EQ(EquivOf("1", kNoText, kPy3, false), ":l:int:");
  EXPECT_EQ(EquivOf("-1", kNoText, kPy3, false), ":l:int:");
  EXPECT_EQ(EquivOf("True", kNoText, kPy3, false), ":l:bool: True");
  EXPECT_EQ(EquivOf("'x'", kNoText, kPy3, false), ":l:str:");
}

TEST(Equivs, OfNamesCallsAndSubscriptsAreTheirText) {
  const std::vector<std::pair<Text, Text>> cases = {
      {"x", "x"}, {"a.b(c).d", "a.b(c).d"}, {"x[0]", "x[0]"}, {"(a.b)", "a.b"}, {"((x))", "x"}, {"a . b", "a.b"},
  };
  for (const auto& [source, equiv] : cases) {
    EXPECT_EQ(EquivOf(source), equiv) << source;
    EXPECT_EQ(EquivOf(source, "[0]"), std::string(equiv) + "[0]") << source;
  }
}

TEST(Equivs, AnEmptyTrailerIsNone) {
  EXPECT_EQ(EquivOf("1", ""), ":l:int: 1");
  EXPECT_EQ(EquivOf("a", ""), "a");
  EXPECT_EQ(EquivOf("a + b", ""), ":e:a + b");
}

TEST(Equivs, OfOperatorsAreTheirTextUpToABound) {
  EXPECT_EQ(EquivOf("a + b"), ":e:a + b");
  EXPECT_EQ(EquivOf("a + b", "[0]"), ":e:(a + b)[0]");
  EXPECT_EQ(EquivOf("-x"), ":e:-x");
  EXPECT_EQ(EquivOf("not x"), ":e:not x");
  EXPECT_EQ(EquivOf("~1"), ":e:~1");
  const std::string longest = "a + " + Times(116, "b");
  EXPECT_EQ(EquivOf(longest), ":e:" + longest);
  EXPECT_EQ(EquivOf(longest + "b"), "<none>");
  // The parentheses in front of a trailer count, the trailer does not.
  EXPECT_EQ(EquivOf(longest, "[0]"), "<none>");
  const std::string shorter = "a + " + Times(114, "b");
  EXPECT_EQ(EquivOf(shorter, "[0][0]"), ":e:(" + shorter + ")[0][0]");
}

TEST(Equivs, TheFieldForTheBoundHasNoEffect) {
  CNodeWalker walker(kPy3);
  walker.fMaxOperatorExpressionLength = 1;
  EXPECT_EQ(RecordsOf(walker, "x = a + b"), (Records{"x :s:", "x :e:a + b", "a :g:", "b :g:"}));
}

TEST(Equivs, OfPowersTernariesAndLambdasAreNone) {
  for (const Text source : {"a ** b", "x if c else y", "lambda: 0", "(x for x in y)", "a ** b ** c"}) {
    EXPECT_EQ(EquivOf(source), "<none>") << source;
    EXPECT_EQ(EquivOf(source, "[0]"), "<none>") << source;
  }
  EXPECT_EQ(EquivOf("a ** b", kNoText, kPy2), "<none>");
}

TEST(Equivs, OfBackquotesAreTheirText) { EXPECT_EQ(EquivOf("`a`", kNoText, kPy2), "`a`"); }

TEST(Equivs, DeepParenthesesAreLookedThroughWithoutRecursion) {
  const int depth = 50000;
  EXPECT_EQ(EquivOf(Times(depth, "(") + "a" + Times(depth, ")"), "[0]"), "a[0]");
}

TEST(Equivs, ForSubscriptedTargets) {
  const auto records = [](Text value, int64_t subscript) {
    const ParsedLine line("x = " + std::string(value));
    auto* stmt = line.Find<CExprStmt>();
    CNodeWalker walker(kPy3);
    LogicalLine out;
    walker.fLogical = &out;
    walker.AppendSubscriptedEquivNode(stmt->GetInitialTestExpr(), stmt->GetPostEqualsTestExpr(0), subscript);
    walker.fLogical = nullptr;
    return RecordStrings(out);
  };
  EXPECT_EQ(records("y", 2), (Records{"x :s:", "x y[2]"}));
  EXPECT_EQ(records("y", -1), (Records{"x :s:", "x y[*]"}));
  EXPECT_EQ(records("a + b", 0), (Records{"x :s:", "x :e:(a + b)[0]"}));
  EXPECT_EQ(records("[1]", 0), Records{"x :s:"});
  EXPECT_EQ(records("a ** b", 0), Records{"x :s:"});
}

TEST(Equivs, OfOperatorsFromTheirTerms) {
  const auto equiv = [](Text source, bool include = true) {
    CNodeWalker walker(kPy3);
    walker.fIncludeOperatorExpressions = include;
    const ParsedLine line(source);
    const Text text = walker.TypeEquivForOperatorExpression(cast<COperatorExpression>(line.root()));
    return IsNone(text) ? std::string("<none>") : std::string(text);
  };
  EXPECT_EQ(equiv("a + 1"), "a + 1");
  EXPECT_EQ(equiv("a not in b"), "a not in b");
  EXPECT_EQ(equiv("not a"), "not a");
  EXPECT_EQ(equiv("a < 'x' < True"), "a < 'x' < True");
  EXPECT_EQ(equiv("a + [b]"), "<none>");
  EXPECT_EQ(equiv("a + (x if y else z)"), "<none>");
  EXPECT_EQ(equiv("a + 1", false), "<none>");
}

TEST(Equivs, NodeInfoIsRecordedUnlessEmpty) {
  const ParsedLine line("a.b");
  CNodeWalker walker(kPy3);
  LogicalLine out;
  walker.fLogical = &out;
  walker.AddNodeInfoStr(line.root(), kNoText);
  walker.AddNodeInfoStr(line.root(), "");
  walker.AddNodeInfoStr(line.root(), "C:");
  walker.fLogical = nullptr;
  EXPECT_EQ(RecordStrings(out), Records{"a.b C:"});
}

// ---- patterns and type parameters ----

TEST(Patterns, DefineWhatTheyCapture) {
  Check({
      {"case Point(x=0, y=yy): pass", {"yy :s:", "Point :g:"}},
      {"case [a, b, *rest]: pass", {"a :s:", "b :s:", "rest :s:"}},
      {"case {'k': v}: pass", {"v :s:"}},
      {"case x as y: pass", {"x :s:", "y :s:"}},
      {"case _: pass", {}},
      {"case [_, a]: pass", {"a :s:"}},
      {"case a.b.C(d): pass", {"d :s:", "a :g:", "b :g:", "C :g:"}},
  });
}

TEST(Patterns, AreWalkedAsAnyNodeWhereAHostHandsThemOver) {
  const ParsedLine line("case a.b | 'c': pass");
  CPatternNode* const pattern = line.Find<CPatternNode>();
  ASSERT_EQ(pattern->kind, NodeKind::kCPatternNode);
  CNodeWalker(kPy3).Walk(pattern, &line.line());
  EXPECT_EQ(RecordStrings(line.line()), (Records{"a :g:", "b :g:"}));
}

TEST(Patterns, ALoneNameOrValueAtTheTopRecordsNothing) { Check({{"case x: pass", {}}, {"case a.b: pass", {}}}); }

TEST(Patterns, DottedValuesInsideAreReadPartByPart) { Check({{"case [a.b, c]: pass", {"c :s:", "a :g:", "b :g:"}}}); }

TEST(Patterns, GuardsAndSubjectsAreRead) {
  Check({{"case x if x > 0: pass", {"x :g:"}}, {"match a.b:", {"a :g:", "a.b :g:"}}});
}

TEST(TypeParameters, OfScopesAreParameters) {
  Check({
      {"def f[T: int, *Ts](): pass", {"f :s:", "int :g:", "arg: T :P:int", "arg: Ts :P:*"}},
      {"class C[T, **P](B): pass", {"C :s:", "B :g:", "arg: T :P:", "arg: P :P:**"}},
  });
}

TEST(TypeParameters, OfAliasesAreNotRecorded) { Check({{"type X[T] = int", {"X :s:", "X int", "int :g:"}}}); }

// ---- size ----

// Walks one line and gives it back, for records too large to be copied.
class WalkedLine {
 public:
  explicit WalkedLine(Text text) : source_(text), line_(source_.Line(0)) {
    CNodeWalker walker(kPy3);
    testing::WalkLine(walker, *line_, kPy3);
  }
  std::span<const Record> records() const { return line_->type_equivs(); }

 private:
  CutSource source_;
  std::unique_ptr<LogicalLine> line_;
};

TEST(Size, AChainOfAHundredThousandAttributesIsReadWhole) {
  const Printed printed;
  const int count = 100000;
  const WalkedLine line("a" + Times(count, ".b"));
  ASSERT_EQ(line.records().size(), static_cast<size_t>(count) + 1);
  for (int i = 0; i <= count; ++i) {
    ASSERT_EQ(line.records()[static_cast<size_t>(i)].name_length, static_cast<uint32_t>(2 * i + 1));
  }
  EXPECT_TRUE(printed.lines().empty());
}

TEST(Size, ChainsApartInTheSourceAndTwiceShareTheirText) {
  const Printed printed;
  const int count = 100000;
  const WalkedLine line("a" + Times(count, " .b") + " + a" + Times(count, " . b"));
  ASSERT_EQ(line.records().size(), static_cast<size_t>(count) + 1);
  EXPECT_EQ(line.records().back().name(), "a" + Times(count, ".b"));
  EXPECT_TRUE(printed.lines().empty());
}

TEST(Size, DeepBracketsReachTheBound) {
  const Printed printed;
  CNodeWalker walker(kPy3);
  const int depth = 10000;
  EXPECT_EQ(RecordsOf(walker, "x = " + Times(depth, "[") + Times(depth, "]")), Records{"x :s:"});
  EXPECT_EQ(RecordsOf(walker, "x = " + Times(depth, "(") + "y" + Times(depth, ")")), (Records{"x :s:", "x y"}));
  EXPECT_EQ(RecordsOf(walker, Times(depth, "[") + "x" + Times(depth, "]") + " = y"), (Records{"x :s:", "x y[0]"}));
  EXPECT_EQ(printed.lines().size(), 3u);
}

TEST(Size, LongSumsReachTheVisitLimit) {
  const Printed printed;
  CNodeWalker walker(kPy3);
  EXPECT_EQ(RecordsOf(walker, "x = a" + Times(200000, " + a")), Records{"x :s:"});
  EXPECT_EQ(printed.lines().size(), 1u);
}

// ---- where errors point ----

struct MadeLine {
  explicit MadeLine(Text text) : source(text), line(source.Line(0)) {}
  CutSource source;
  std::unique_ptr<LogicalLine> line;
};

std::pair<int64_t, int64_t> PlaceOf(const LogicalLine& line, Context context, const Position* in_token = nullptr) {
  const SyntaxError error = CreateSyntaxError("m", line, context, in_token);
  EXPECT_EQ(error.filename, "<string>");
  EXPECT_EQ(error.message(), "m");
  return {error.lineno, error.offset};
}

using Place = std::pair<int64_t, int64_t>;

TEST(SyntaxErrors, OfAnEmptyLinePointAtItsStart) {
  const LogicalLine line;
  EXPECT_EQ(PlaceOf(line, Context::Index(5)), (Place{1, 1}));
  EXPECT_EQ(CreateSyntaxError("m", line, Context::Index(0)).text, "");
}

TEST(SyntaxErrors, PointAtATokenOrBehindTheLast) {
  const MadeLine made("abc foo");
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(1)), (Place{1, 5}));
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(2)), (Place{1, 8}));
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(9)), (Place{1, 8}));
  EXPECT_EQ(CreateSyntaxError("m", *made.line, Context::Index(0)).text, "abc foo");
}

TEST(SyntaxErrors, CountColumnsInBytes) {
  const MadeLine made("\xC3\xA9 \xC3\xA9\xC3\xA9");
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(1)), (Place{1, 4}));
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(2)), (Place{1, 8}));
}

TEST(SyntaxErrors, PointInsideATokenOnItsFirstLineOrFurtherDown) {
  const MadeLine made("aaaaaaaaa (\nfoo)");
  const Position first_line{0, 3};
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(1), &first_line), (Place{1, 14}));
  const Position further_down{2, 3};
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(2), &further_down), (Place{4, 4}));
}

TEST(SyntaxErrors, TakeAPositionAsItIs) {
  const MadeLine made("abc");
  EXPECT_EQ(PlaceOf(*made.line, Context::At({5, 7})), (Place{6, 8}));
}

TEST(SyntaxErrors, NegativeIndicesCountFromTheEnd) {
  const MadeLine made("abc foo");
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(-1)), (Place{1, 5}));
  EXPECT_EQ(PlaceOf(*made.line, Context::Index(-2)), (Place{1, 1}));
  try {
    CreateSyntaxError("m", *made.line, Context::Index(-3));
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kIndexError);
  }
}

TEST(SyntaxErrors, ContextsThatAreNoPlaceAreATypeError) {
  const MadeLine made("abc");
  for (const Context context : {Context::None(), Context::Foreign(1)}) {
    try {
      CreateSyntaxError("m", *made.line, context);
      FAIL();
    } catch (const Error& error) {
      EXPECT_EQ(error.kind(), ErrorKind::kTypeError);
    }
  }
}

}  // namespace
}  // namespace quillet
