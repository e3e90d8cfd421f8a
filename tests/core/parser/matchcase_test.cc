// Match and case heads and patterns: the tree of every form, and the position of every rejection.
#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "parser/match_case_parser.h"
#include "tests/core/support/analysis_helper.h"
#include "tests/core/support/tree_text.h"

namespace quillet {
namespace {

using testing::kPy3;
using testing::ParserFor;
using testing::ShowContexts;
using testing::ShowTree;

struct Parsed {
  std::string tree;
  std::string contexts;
};

Parsed ParseLine(Text text) {
  const Ref<SourceText> source = SourceText::Copy(text);
  TokenizeOnly(*source, kPy3);
  CPGenParserImpl& parser = ParserFor(kPy3);
  try {
    CNode* node = parser.ParseToksToNode(source->tokens, false, PositionView(source.get(), source->tokens, 0));
    const Parsed parsed{ShowTree(node), node != nullptr ? ShowContexts(node) : ""};
    if (node != nullptr) parser.DiscardNode(node);
    return parsed;
  } catch (const ParseError& error) {
    const Context context = error.context;
    const std::string place =
        context.IsPosition() ? std::to_string(context.position().line) + ":" + std::to_string(context.position().col)
                             : "token " + std::to_string(context.value);
    return {"error at " + place, ""};
  }
}

std::string Parse(Text text) { return ParseLine(text).tree; }
// The pattern of `case <pattern>:`, or where it is rejected, as a column of the pattern.
std::string Pattern(const std::string& pattern) {
  std::string tree = Parse("case " + pattern + ":");
  const std::string front = "CCaseStmt(case ";
  const std::string back = " :)";
  if (tree.starts_with(front)) return tree.substr(front.size(), tree.size() - front.size() - back.size());
  const std::string error = "error at 0:";
  if (tree.starts_with(error)) return "error at " + std::to_string(std::stoi(tree.substr(error.size())) - 5);
  return tree;
}

struct Case {
  const char* source;
  const char* result;
};

// ---- statements ----

TEST(MatchStatement, HasTheSubjectWithoutTheBracketsItWasParsedIn) {
  const Case cases[] = {
      {"match x:", "CMatchStmt(match x :)"},
      {"match (x):", "CMatchStmt(match atom(( x )) :)"},
      {"match a, b:", "CMatchStmt(match testlist_comp(a , b) :)"},
      {"match *a, b:", "CMatchStmt(match testlist_comp(star_expr(* a) , b) :)"},
      {"match {1: 2}[x:y]:",
       "CMatchStmt(match atom_expr(atom({ dictorsetmaker(1 : 2) }) trailer([ subscript(x : y) ])) :)"},
      {"match f(x): # c", "CMatchStmt(match atom_expr(f trailer(( x ))) :)"},
      {"match x \\\n :", "CMatchStmt(match x :)"},
  };
  for (const Case& c : cases) EXPECT_EQ(Parse(c.source), c.result) << c.source;
}

// What is found as the head's end need not be the token that becomes the closing bracket.
TEST(MatchStatement, TheLastTokenIsReplacedWhateverItIs) {
  EXPECT_EQ(ParseLine("match lambda: x:").tree, "CMatchStmt(match lambdef(lambda : x) :)");
  EXPECT_EQ(ParseLine("match lambda: x:").contexts, "0:0 1 2 3 0:12");
  // The colon stays inside of the brackets, and is rejected there.
  EXPECT_EQ(Parse("match x: \\"), "error at token 2");
  // A body makes it an annotation, which the regular parser reads.
  EXPECT_EQ(Parse("match x: pass"), "error at token 1");
}

TEST(MatchStatement, ABackslashJoinsLinesOrIsRejected) {
  const Case cases[] = {
      {"match \\\n x:", "CMatchStmt(match x :)"},
      {"match \\ x:", "error at token 1"},
      {"match x \\ :", "error at token 2"},
      {"match x \\\n \\\n :", "CMatchStmt(match x :)"},
  };
  for (const Case& c : cases) EXPECT_EQ(Parse(c.source), c.result) << c.source;
  EXPECT_EQ(Pattern("\\ x"), "error at 0");
}

TEST(MatchStatement, LeavesMadeByHandCarryPositions) {
  EXPECT_EQ(ParseLine("match x:").contexts, "0:0 1 0:7");
  EXPECT_EQ(ParseLine("case x if y: z").contexts, "0:0 0:5 0 1 2 3 0:11 0");
  EXPECT_EQ(ParseLine("case \\\n  x:").contexts, "0:0 1:2 1:3");
}

TEST(SoftKeywords, OrdinaryStatementsGoToTheRegularParser) {
  const Case cases[] = {
      {"match = 1", "expr_stmt(match = 1)"},
      {"match(x)", "atom_expr(match trailer(( x )))"},
      {"print(match)", "atom_expr(print trailer(( match )))"},
      {"case = 1", "expr_stmt(case = 1)"},
      {"case(x)", "atom_expr(case trailer(( x )))"},
      {"match.x: int", "expr_stmt(atom_expr(match trailer(. x)) annassign(: int))"},
      {"match", "match"},
  };
  for (const Case& c : cases) EXPECT_EQ(Parse(c.source), c.result) << c.source;
}

TEST(SoftKeywords, AHeadWithoutAColonIsNoStatementOfTheirs) {
  EXPECT_EQ(Parse("match x"), "error at token 1");
  EXPECT_EQ(Parse("case x"), "error at token 1");
}

TEST(CaseStatement, HasGuardAndBodyWhereTheLineHasThem) {
  const Case cases[] = {
      {"case x:", "CCaseStmt(case x :)"},
      {"case x if y:", "CCaseStmt(case x if_stmt(if y : pass) :)"},
      {"case x: pass", "CCaseStmt(case x : pass)"},
      {"case x if y: z = 1", "CCaseStmt(case x if_stmt(if y : pass) : expr_stmt(z = 1))"},
      {"case x if y: # c", "CCaseStmt(case x if_stmt(if y : pass) :)"},
      {"case x: \\", "CCaseStmt(case x :)"},
      {"case {\"k\": v}:", "CCaseStmt(case CSequencePatternNode({ \"k\" : v }) :)"},
  };
  for (const Case& c : cases) EXPECT_EQ(Parse(c.source), c.result) << c.source;
}

TEST(CaseStatement, AnErrorInThePatternComesBeforeOneInTheGuardOrTheBody) {
  EXPECT_EQ(Parse("case 1 2 if +: +"), "error at 0:7");
  // Indices in a guard and in a body count from the slice's start.
  EXPECT_EQ(Parse("case x if +: +"), "error at token 2");
  EXPECT_EQ(Parse("case x: 1 2"), "error at token 1");
}

TEST(CaseStatement, AnIfInBracketsIsNoGuard) { EXPECT_EQ(Pattern("[a if b else c]"), "error at 3"); }

TEST(CaseStatement, MissingPartsAreRejected) {
  EXPECT_EQ(Parse("case if y:"), "error at 0:0");
  EXPECT_EQ(Parse("case x if:"), "error at token 1");
}

// ---- patterns ----

TEST(Patterns, OneTokenIsALeaf) {
  for (const char* source : {"_", "x", "None", "True", "1", "1.5j", "\"s\"", "'''s'''"})
    EXPECT_EQ(Pattern(source), source);
  EXPECT_EQ(Pattern("+"), "error at 0");
  EXPECT_EQ(Pattern("..."), "error at 0");
}

TEST(Patterns, LeavesOfKeywordsAreKeywords) {
  const Ref<SourceText> source = SourceText::Copy("case None:");
  TokenizeOnly(*source, kPy3);
  CNode* node = ParserFor(kPy3).ParseToksToNode(source->tokens, false, PositionView(source.get(), source->tokens, 0));
  EXPECT_EQ(node->Child(0)->kind, NodeKind::kCNameLiteral);
  EXPECT_EQ(node->Child(1)->kind, NodeKind::kCKeywordLiteral);
  ParserFor(kPy3).DiscardNode(node);
}

TEST(Patterns, Numbers) {
  const Case cases[] = {
      {"-1", "CPatternNode(- 1)"},
      {"+1", "CPatternNode(+ 1)"},
      {"1 + 2j", "CPatternNode(1 + 2j)"},
      {"-1 - 2j", "CPatternNode(- 1 - 2j)"},
      {"1 2", "error at 2"},
      {"1 + x", "error at 4"},
      {"- x", "error at 2"},
      {"1 +", "error at 3"},
      {"1 + 2 + 3", "error at 6"},
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
}

TEST(Patterns, DottedValues) {
  const Case cases[] = {
      {"a.b", "CExpression(a . b)"}, {"a.b.c", "CExpression(a . b . c)"}, {"a.", "error at 1"}, {"a b", "error at 2"},
      {"a..b", "error at 2"},        {"\"a\" \"b\"", "error at 0"},
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
}

TEST(Patterns, ClassPatterns) {
  const Case cases[] = {
      {"Point()", "CClassPatternNode(CExpression(Point) ()"},
      {"a.b.c(x=1)", "CClassPatternNode(CExpression(a . b . c) ( CClassArgumentPatternNode(x = 1))"},
      {"Point(x=0, y=0)",
       "CClassPatternNode(CExpression(Point) ( CClassArgumentPatternNode(x = 0) , CClassArgumentPatternNode(y = 0))"},
      {"Point(0, y=0,)", "CClassPatternNode(CExpression(Point) ( 0 , CClassArgumentPatternNode(y = 0) ,)"},
      {"Point(1=2)", "CClassPatternNode(CExpression(Point) ( CClassArgumentPatternNode(1 = 2))"},
      {"Point(a b=1)", "error at 9"},
      {"Point(x=)", "error at 8"},
      {"Foo((a))", "CClassPatternNode(CExpression(Foo) ( CPatternNode(( a )))"},
      {"f(x)(y)", "error at 3"},
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
  EXPECT_EQ(Parse("case Point(1] :"), "error at 0:12");
}

TEST(Patterns, Sequences) {
  const Case cases[] = {
      {"[]", "CSequencePatternNode([ ])"},
      {"[a]", "CSequencePatternNode([ a ])"},
      {"[a, *rest]", "CSequencePatternNode([ a , CPatternNode(* rest) ])"},
      {"(a, b)", "CSequencePatternNode(( a , b ))"},
      {"(a,)", "CSequencePatternNode(( a , ))"},
      {"*rest", "CPatternNode(* rest)"},
      {"*1", "error at 0"},
      {"[,]", "error at 1"},
      {"[a,,b]", "error at 3"},
      {"[a)", "error at 2"},
      {"(a, b]", "error at 5"},
      {"[1 2)", "error at 3"},  // an error in an element wins over the wrong bracket
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
}

TEST(Patterns, AGroupPassesOnlyInFrontOfAClosingParenthesis) {
  EXPECT_EQ(Pattern("(a)"), "error at 2");
  EXPECT_EQ(Pattern("()"), "error at 1");
  EXPECT_EQ(Pattern("((a), (b))"), "error at 3");
  EXPECT_EQ(Pattern("(a, (b))"), "CSequencePatternNode(( a , CPatternNode(( b )) ))");
}

TEST(Patterns, MappingsAreSequenceNodesWithBraces) {
  const Case cases[] = {
      {"{}", "CSequencePatternNode({ })"},
      {"{\"k\": v, **rest}", "CSequencePatternNode({ \"k\" : v ** rest })"},
      {"{**a, **b, 1: c,}", "CSequencePatternNode({ ** a ** b 1 : c })"},
      {"{a.b: [c]}", "CSequencePatternNode({ CExpression(a . b) : CSequencePatternNode([ c ]) })"},
      {"{k}", "error at 1"},
      {"{1: a]", "error at 5"},
      {"{1:}", "error at 3"},
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
}

TEST(Patterns, Alternatives) {
  const Case cases[] = {
      {"a | b | c", "CPatternNode(a | b | c)"},
      {"a |", "CPatternNode(a |)"},
      {"[a | b] | c", "CPatternNode(CSequencePatternNode([ CPatternNode(a | b) ]) | c)"},
      {"| a", "error at 0"},
      {"a || b", "error at 3"},
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
}

TEST(Patterns, AsBindsLoosest) {
  const Case cases[] = {
      {"a as b", "CPatternNode(a as b)"},
      {"a | b as c", "CPatternNode(CPatternNode(a | b) as c)"},
      {"a as _", "CPatternNode(a as _)"},
      {"a as None", "CPatternNode(a as None)"},
      {"a as b as c", "error at 2"},
      {"a as 1", "error at 5"},
      {"a as b | c", "error at 2"},
      {"1 2 as 3", "error at 2"},  // the left part is parsed first
      {"as x", "error at 3"},
      {"[a as b]", "CSequencePatternNode([ CPatternNode(a as b) ])"},
  };
  for (const Case& c : cases) EXPECT_EQ(Pattern(c.source), c.result) << c.source;
}

// ---- size and bad input ----

std::string Repeat(const std::string& text, int count) {
  std::string repeated;
  for (int i = 0; i < count; ++i) repeated += text;
  return repeated;
}

TEST(Patterns, NestToALimitAndThenFailAtTheNextBracket) {
  const int limit = CMatchCaseStatementParser::kMaxPatternDepth;
  ::testing::internal::CaptureStdout();  // giving back a tree that deep prints a line
  EXPECT_TRUE(Pattern(Repeat("[", limit) + "a" + Repeat("]", limit)).starts_with("CSequencePatternNode("));
  ::testing::internal::GetCapturedStdout();
  EXPECT_EQ(Pattern(Repeat("[", limit + 1) + "a" + Repeat("]", limit + 1)), "error at " + std::to_string(limit));
  EXPECT_EQ(Pattern(Repeat("[", 100000) + "a" + Repeat("]", 100000)), "error at " + std::to_string(limit));
  EXPECT_EQ(Pattern(Repeat("A(", 100000) + Repeat(")", 100000)), "error at " + std::to_string(limit * 2 + 1));
  EXPECT_EQ(Pattern(Repeat("{1:", 100000) + "a" + Repeat("}", 100000)), "error at " + std::to_string(limit * 3));
}

TEST(Patterns, AHundredThousandElementsTakeLinearTime) {
  EXPECT_TRUE(Pattern("[" + Repeat("a, ", 100000) + "]").starts_with("CSequencePatternNode([ a , a"));
  EXPECT_TRUE(Pattern(Repeat("a | ", 100000) + "b").starts_with("CPatternNode(a | a"));
  EXPECT_TRUE(Pattern("A(" + Repeat("x=[1], ", 50000) + ")").starts_with("CClassPatternNode(CExpression(A) ("));
  const int depth = 90;
  EXPECT_TRUE(Pattern(Repeat("[", depth) + Repeat("(a, b), ", 100000) + Repeat("]", depth)).starts_with("CSeq"));
}

TEST(Patterns, NodesOfFailedPatternsAreUsedAgain) {
  const NodePool& pool = ParserFor(kPy3).factory().pool();
  const auto fail = [] { return Pattern("Point(x=[1, {2: 3}], y=(a, b) as c, d | e, 1 2)"); };
  for (int i = 0; i < 3; ++i) fail();
  const size_t count = pool.node_count();
  for (int i = 0; i < 1000; ++i) fail();
  EXPECT_EQ(pool.node_count(), count);
}

// The search jumps over groups; a plain scan that counts the depth has to find the same.
TEST(Searching, JumpsOverGroupsGiveWhatCountingGives) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  std::mt19937 random(7);
  const char* const choices[] = {"(", ")", "[", "]", "{", "}", ",", "|", "a", ":"};
  for (int round = 0; round < 3000; ++round) {
    std::string text;
    const int length = 1 + static_cast<int>(random() % 14);
    for (int i = 0; i < length; ++i) text += std::string(choices[random() % 10]) + " ";
    const Ref<SourceText> source = SourceText::Copy(text);
    TokenizeOnly(*source, kPy3);
    const TokenSpan toks = source->tokens;
    parser.SetTokens(toks, PositionView(source.get(), toks, 0));
    const int64_t count = static_cast<int64_t>(toks.size());
    for (const char* wanted : choices) {
      for (int64_t start = 0; start <= count; ++start) {
        for (int64_t end = start; end <= count; ++end) {
          ASSERT_EQ(parser.NonNestedFindTokenIndex(wanted, start, end),
                    CPGenParserImpl::NonNestedFindTokenIndex(wanted, toks, start, end))
              << text << " for " << wanted << " from " << start << " to " << end;
        }
      }
    }
    parser.ClearTokens();
  }
}

TEST(Steps, SkippedTokensAreRemovedWithTheirPositions) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const Ref<SourceText> source = SourceText::Copy("case ( # c\n a, \\\n b): \\");
  TokenizeOnly(*source, kPy3);
  parser.SetKeptTokens(source->tokens, PositionView(source.get(), source->tokens, 0));
  std::string shown;
  for (size_t i = 0; i < parser.toks().size(); ++i) {
    shown += std::string(parser.toks()[i].view()) + "@" + std::to_string(parser.positions()[i].line) + " ";
  }
  // A backslash behind which nothing stands stays.
  EXPECT_EQ(shown, "case@0 (@0 a@1 ,@1 b@2 )@2 :@2 \\@2 ");
  parser.ClearTokens();
  EXPECT_TRUE(parser.toks().empty());
}

TEST(Steps, RemovedAndEmptyTokensAreErrorsOfTheHostsKind) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const std::vector<Position> positions(1);
  const std::vector<Token> removed(1);
  const std::vector<Token> empty{Token{"", 0, tok::ERRORTOKEN}};
  const auto kind_of = [&](const std::vector<Token>& toks) {
    try {
      parser.SetKeptTokens(toks, PositionView(positions));
    } catch (const Error& error) {
      parser.ClearTokens();
      return error.kind();
    }
    return ErrorKind::kAssertionError;
  };
  EXPECT_EQ(kind_of(removed), ErrorKind::kTypeError);
  EXPECT_EQ(kind_of(empty), ErrorKind::kIndexError);
}

TEST(Steps, AFailureLeavesTheTokensAsTheyWere) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const Ref<SourceText> source = SourceText::Copy("match x y:");
  TokenizeOnly(*source, kPy3);
  parser.SetTokens(source->tokens, PositionView(source.get(), source->tokens, 0));
  EXPECT_THROW(parser.Run([&] { return parser.ParseMatchStmtImpl(); }), ParseError);
  EXPECT_EQ(parser.toks().front().view(), "match");
  EXPECT_EQ(parser.toks().back().view(), ":");
  EXPECT_THROW(parser.Run([&] { return parser.ParseMatchStmtImpl(); }), ParseError);
  parser.ClearTokens();
}

TEST(Steps, AFailureGivesBackWhatItMade) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const Ref<SourceText> source = SourceText::Copy("case [a, b, +]:");
  TokenizeOnly(*source, kPy3);
  parser.SetTokens(source->tokens, PositionView(source.get(), source->tokens, 0));
  const auto fail = [&] { EXPECT_THROW(parser.Run([&] { return parser.NodeForPattern(1, 8); }), ParseError); };
  fail();
  const size_t count = ParserFor(kPy3).factory().pool().node_count();
  for (int i = 0; i < 1000; ++i) fail();
  EXPECT_EQ(ParserFor(kPy3).factory().pool().node_count(), count);
  parser.ClearTokens();
}

TEST(Steps, OneOperationRunsAtATime) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const auto parse = [] { return Parse("match x:"); };
  EXPECT_EQ(parser.Run([&] {
    try {
      parse();
    } catch (const Error& error) {
      return error.message();
    }
    return std::string();
  }),
            "a match or case statement is being parsed");
  EXPECT_EQ(parse(), "CMatchStmt(match x :)");
}

TEST(Steps, TokensMayHaveFewerPositions) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const Ref<SourceText> source = SourceText::Copy("case x: # c");
  TokenizeOnly(*source, kPy3);
  const std::vector<Position> positions(1);
  parser.SetTokens(source->tokens, PositionView(positions));
  EXPECT_EQ(parser.toks().size(), 4u);
  EXPECT_EQ(parser.ParseExceptionAt(-4).value, "case");
  EXPECT_THROW(parser.ParseExceptionAt(1), Error);
  EXPECT_THROW(parser.ParseExceptionAt(4), Error);
  EXPECT_THROW(parser.ParseExceptionAt(-5), Error);
  parser.ClearTokens();
}

TEST(Searching, ReadsNoFurtherThanTheTokenThatIsFound) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const Ref<SourceText> source = SourceText::Copy("match x:");
  TokenizeOnly(*source, kPy3);
  parser.SetTokens(source->tokens, PositionView(source.get(), source->tokens, 0));
  EXPECT_EQ(parser.NonNestedFindTokenIndex("match", 0, 100), 0);
  EXPECT_EQ(parser.NonNestedFindTokenIndex(":", 1, 100), 2);
  EXPECT_THROW(parser.NonNestedFindTokenIndex("y", 0, 100), Error);
  EXPECT_THROW(parser.NonNestedFindTokenIndex("y", 50, 100), Error);
  parser.ClearTokens();
}

TEST(Steps, AnErrorNamesTheTokenAndItsPosition) {
  CMatchCaseStatementParser& parser = ParserFor(kPy3).match_case_parser();
  const Ref<SourceText> source = SourceText::Copy("case x:");
  TokenizeOnly(*source, kPy3);
  parser.SetTokens(source->tokens, PositionView(source.get(), source->tokens, 0));
  const ParseError error = parser.ParseExceptionAt(1);
  EXPECT_EQ(error.message(), "Invalid syntax");
  EXPECT_EQ(error.type, 0);
  EXPECT_EQ(error.value, "x");
  EXPECT_EQ(error.context, Context::At({0, 5}));
  parser.ClearTokens();
}

TEST(Patterns, MutatedLinesGiveTreesOrPositionedErrors) {
  std::mt19937 random(11);
  const char* const pieces[] = {"case ", "match ", "(", ")", "[", "]",  "{", "}", ",", "|",   "as ", "x",     "_",
                                "1",     "\"s\"",  ":", "=", "*", "**", ".", "-", "+", "if ", "A(",  "# c\n", "\\\n"};
  int trees = 0;
  for (int round = 0; round < 100000; ++round) {
    std::string text = random() % 8 == 0 ? "match " : "case ";
    const int length = 1 + static_cast<int>(random() % 10);
    for (int i = 0; i < length; ++i) text += pieces[random() % std::size(pieces)];
    text += ":";
    const std::string tree = Parse(text);
    trees += !tree.starts_with("error at");
  }
  EXPECT_GT(trees, 1000);
}

}  // namespace
}  // namespace quillet
