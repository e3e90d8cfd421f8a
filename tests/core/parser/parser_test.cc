// Feeding and the special cases: which fragments parse, to what tree, and where a rejection points.
#include "parser/parser.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "tests/core/support/analysis_helper.h"
#include "tests/core/support/tree_text.h"

namespace quillet {
namespace {

using testing::kPy2;
using testing::kPy3;
using testing::ParserFor;
using testing::ShowContexts;
using testing::ShowTree;

// The tokens of a text, whatever its lines, as one list.
class Tokens {
 public:
  explicit Tokens(Text text, Version version = kPy3) : source_(SourceText::Copy(text)) {
    TokenizeOnly(*source_, version);
  }
  TokenSpan span() const { return source_->tokens; }
  PositionView positions() const { return PositionView(source_.get(), span(), 0); }

 private:
  Ref<SourceText> source_;
};

std::string ParseWith(CPGenParserImpl& parser, Text text, bool in_async_def = false) {
  const Tokens tokens(text, parser.version());
  try {
    CNode* node = parser.ParseToksToNode(tokens.span(), in_async_def, tokens.positions());
    const std::string shown = ShowTree(node);
    if (node != nullptr) parser.DiscardNode(node);
    return shown;
  } catch (const ParseError& error) {
    if (error.context.IsPosition()) {
      return "error at " + std::to_string(error.context.position().line) + ":" +
             std::to_string(error.context.position().col);
    }
    return "error at " + std::to_string(error.context.value);
  }
}

std::string Parse3(Text text) { return ParseWith(ParserFor(kPy3), text); }
std::string Parse2(Text text) { return ParseWith(ParserFor(kPy2), text); }

std::unique_ptr<CPGenParserImpl> Python3Parser(Version version) {
  CPGenParserImpl::Options options = testing::ParserOptions(kPy3);
  options.version = version;
  return std::make_unique<CPGenParserImpl>(options);
}

struct Case {
  const char* source;
  const char* result;
};

// ---- construction ----

TEST(ParserConstruction, KeywordListsHaveTheWordsOfTheirVersions) {
  EXPECT_EQ(Py3Keywords().size(), 35u);
  EXPECT_EQ(Py27Keywords().size(), 31u);
  const auto has = [](std::span<const Text> words, Text word) {
    return std::find(words.begin(), words.end(), word) != words.end();
  };
  EXPECT_TRUE(has(Py3Keywords(), "async") && has(Py3Keywords(), "None") && !has(Py3Keywords(), "print"));
  EXPECT_TRUE(has(Py27Keywords(), "print") && has(Py27Keywords(), "exec") && !has(Py27Keywords(), "None"));
}

TEST(ParserConstruction, AsyncIsAKeywordFromVersion37On) {
  EXPECT_FALSE(Python3Parser({{3, 6, 9}, 3})->async_always_keyword());
  EXPECT_TRUE(Python3Parser({{3, 7, 0}, 3})->async_always_keyword());
  EXPECT_TRUE(Python3Parser({{3, 7, 0}, 2})->async_always_keyword());
  EXPECT_FALSE(Python3Parser({{3, 0, 0}, 1})->async_always_keyword());
  EXPECT_TRUE(Python3Parser({{4, 0, 0}, 1})->async_always_keyword());
}

TEST(ParserConstruction, StateNamesAreBareAndLaterRowsOverride) {
  const auto kinds = KindsByStateName();
  const auto kind_of = [&](Text name) {
    for (const auto& [state, kind] : kinds)
      if (state == name) return NameOfNodeKind(kind);
    return "none";
  };
  EXPECT_STREQ(kind_of("atom_expr"), "CAtomExpr");
  EXPECT_STREQ(kind_of("power"), "CPower");
  EXPECT_STREQ(kind_of("list_for"), "CCompForNode");
  EXPECT_STREQ(kind_of("test"), "CIfElseExpression");
  EXPECT_STREQ(kind_of("suite"), "none");
  for (const auto& [state, kind] : kinds) EXPECT_EQ(state.find_first_of(" :"), Text::npos) << state;
}

TEST(ParserConstruction, StatesThatNoTableNamesArePlainNodes) {
  const CPGenParserImpl& parser = ParserFor(kPy3);
  const Grammar& grammar = parser.grammar();
  const auto& kinds = parser.kinds_for_states();
  ASSERT_EQ(kinds.size(), Grammar::kFirstSymbol + grammar.symbol_names.size());
  EXPECT_EQ(kinds[static_cast<size_t>(grammar.symbol2number.at("suite"))], NodeKind::kCNode);
  EXPECT_EQ(kinds[tok::LPAR], NodeKind::kCNode);
  EXPECT_EQ(kinds[tok::NAME], NodeKind::kCNameLiteral);
  EXPECT_EQ(kinds[static_cast<size_t>(grammar.symbol2number.at("if_stmt"))], NodeKind::kCIfStmt);
}

// A class may name a rule that only one of the grammars has.
TEST(ParserConstruction, ARuleThatTheGrammarLacksChangesNothing) {
  const auto has_class = [](Version version, NodeKind kind) {
    const auto& kinds = ParserFor(version).kinds_for_states();
    return std::find(kinds.begin(), kinds.end(), kind) != kinds.end();
  };
  EXPECT_TRUE(ParserFor(kPy2).grammar().symbol2number.contains("listmaker"));
  EXPECT_TRUE(has_class(kPy2, NodeKind::kCListmakerNode));
  EXPECT_FALSE(ParserFor(kPy3).grammar().symbol2number.contains("listmaker"));
  EXPECT_FALSE(has_class(kPy3, NodeKind::kCListmakerNode));
  EXPECT_EQ(Parse2("[a, b]"), "atom([ listmaker(a , b) ])");
  EXPECT_EQ(Parse3("[a, b]"), "atom([ testlist_comp(a , b) ])");
}

TEST(ParserConstruction, StatesAreNamedAfterTokensAndSymbols) {
  const CNodeFactory& factory = ParserFor(kPy3).factory();
  EXPECT_EQ(factory.class_info(tok::NAME)->fName, "NAME");
  EXPECT_EQ(factory.class_info(tok::RARROW)->fName, "RARROW");
  EXPECT_EQ(factory.class_info(tok::COMMENT)->fName, "COMMENT");
  EXPECT_TRUE(IsNone(factory.class_info(100)->fName));
}

// A host's grammar may have keywords that the tokeniser has never heard of.
TEST(ParserConstruction, AGrammarMayHaveKeywordsOfItsOwn) {
  CPGenParserImpl::Options options = testing::ParserOptions(kPy3);
  std::ifstream in(options.grammar_file);
  std::string text{std::istreambuf_iterator<char>(in), {}};
  const std::string rule = "pass_stmt: 'pass'";
  ASSERT_NE(text.find(rule), std::string::npos);
  text.replace(text.find(rule), rule.size(), "pass_stmt: 'pass' | 'skip' NAME");
  options.grammar_file = ::testing::TempDir() + "quillet_grammar_with_skip";
  std::ofstream(options.grammar_file) << text;
  CPGenParserImpl parser(options);
  std::remove(options.grammar_file.c_str());
  const auto tree_of = [&parser](Text source) {
    const testing::CutSource cut(source);
    const std::unique_ptr<LogicalLine> line = cut.Line(0);
    try {
      CNode* node = parser.ParseToNode(*line, false);
      const std::string shown = testing::ShowTree(node);
      parser.DiscardNode(node);
      return shown;
    } catch (const ParseError& error) {
      return "error at " + std::to_string(error.context.value);
    }
  };
  EXPECT_EQ(tree_of("skip work"), "pass_stmt(skip work)");
  EXPECT_EQ(tree_of("skip = work"), "error at 1");
  EXPECT_EQ(tree_of("work = play"), "expr_stmt(work = play)");
  EXPECT_EQ(tree_of("pass"), "pass");
}

TEST(ParserConstruction, AGrammarFileThatIsMissingIsNamed) {
  CPGenParserImpl::Options options = testing::ParserOptions(kPy3);
  options.grammar_file = "/no/such/grammar";
  try {
    CPGenParserImpl parser(options);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kOSError);
    EXPECT_NE(error.message().find("/no/such/grammar"), std::string::npos);
  }
}

TEST(ParserConstruction, AGrammarWithoutFileInputIsAKeyError) {
  const std::string path = ::testing::TempDir() + "quillet_no_file_input_grammar";
  std::ofstream(path) << "start: NAME NEWLINE\n";
  CPGenParserImpl::Options options = testing::ParserOptions(kPy3);
  options.grammar_file = path;
  try {
    CPGenParserImpl parser(options);
    ADD_FAILURE();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kKeyError);
  }
  std::remove(path.c_str());
}

// ---- feeding ----

TEST(Feeding, FragmentsGetWhatTheGrammarLacks) {
  const Case cases[] = {
      {"else:", "if_stmt(if 0 : pass else : pass)"},
      {"elif x:", "if_stmt(if x : pass)"},
      {"if x:", "if_stmt(if x : pass)"},
      {"except ValueError as e:", "try_stmt(try : pass except_clause(except ValueError as e) : pass)"},
      {"except:", "try_stmt(try : pass except : pass)"},
      {"finally:", "try_stmt(try : pass finally : pass)"},
      {"try:", "try_stmt(try : pass finally : pass)"},
      {"while x: break", "while_stmt(while x : break)"},
      {"class C: pass", "classdef(class C : pass)"},
      {"class C:", "classdef(class C : pass)"},
      {"def f(): return 1", "funcdef(def f parameters(( )) : return_stmt(return 1))"},
      {"@decorator", "decorator(@ decorator NEWLINE)"},
      {"@decorator(1)", "decorator(@ decorator ( 1 ) NEWLINE)"},
      {"x", "x"},
      {"pass", "pass"},
      {"x = 1", "expr_stmt(x = 1)"},
      {"a; b", "simple_stmt(a ; b NEWLINE)"},
  };
  for (const Case& c : cases) EXPECT_EQ(Parse3(c.source), c.result) << c.source;
}

TEST(Feeding, ATryWithItsBodyOnTheLineGetsNoOther) {
  EXPECT_EQ(Parse3("try: x = 1"), "try_stmt(try : expr_stmt(x = 1) finally : pass)");
}

TEST(Feeding, InventedTokensInFrontHaveTheIndexOfTheFirstTokenAndThoseBehindTheCount) {
  const auto contexts = [](Text text) {
    const Tokens tokens(text);
    CNode* node = ParserFor(kPy3).ParseToksToNode(tokens.span(), false, tokens.positions());
    const std::string shown = ShowContexts(node);
    ParserFor(kPy3).DiscardNode(node);
    return shown;
  };
  EXPECT_EQ(contexts("else:"), "0 0 0 0 0 1 2");
  EXPECT_EQ(contexts("# x\nelse:"), "1 1 1 1 1 2 3");
  EXPECT_EQ(contexts("try:"), "0 1 2 2 2 2");
  EXPECT_EQ(contexts("elif x:"), "0 1 2 3");
}

TEST(Feeding, RejectionsPointAtTheTokenOrBehindTheLast) {
  const Case cases[] = {
      {"x = a[1:", "error at 6"},  // gets its "pass", which is not acceptable
      {"x +", "error at 2"},
      {"x y", "error at 1"},
      {"(", "error at 1"},
      {"else", "error at 1"},
      {"except +:", "error at 2"},
      {"x = $", "error at 2"},
      {"def f[T(x): pass", "error at 2"},
      {"case 1 2:", "error at 0:7"},
  };
  for (const Case& c : cases) EXPECT_EQ(Parse3(c.source), c.result) << c.source;
}

TEST(Feeding, AnArgumentListHasNoEmptyPlaces) {
  EXPECT_EQ(Parse3("f(a,)"), "atom_expr(f trailer(( arglist(a ,) )))");
  EXPECT_EQ(Parse3("f(a,,)"), "error at 4");
  EXPECT_EQ(Parse2("f(a,,)"), "error at 4");
}

TEST(Feeding, CommentsAndContinuationsAreDropped) {
  EXPECT_EQ(Parse3("x = \\\n  1 # why"), "expr_stmt(x = 1)");
  EXPECT_EQ(Parse3("f(a, # first\n  b)"), "atom_expr(f trailer(( arglist(a , b) )))");
  EXPECT_EQ(Parse3("x = 1 \\"), "expr_stmt(x = 1)");
}

TEST(Feeding, ABackslashInFrontOfATokenOfItsOwnLineIsRejected) { EXPECT_EQ(Parse3("x = \\ 1"), "error at 2"); }

TEST(Feeding, ATokenListWithoutPositionsDropsEveryBackslash) {
  const Tokens tokens("x = \\ 1");
  CNode* node = ParserFor(kPy3).ParseTokenListToNode(tokens.span(), false);
  EXPECT_EQ(ShowTree(node), "expr_stmt(x = 1)");
  ParserFor(kPy3).DiscardNode(node);
}

TEST(Feeding, ATokenListTakesNoSpecialCase) {
  const Tokens tokens("with (a, b): pass");
  CNode* node = ParserFor(kPy3).ParseTokenListToNode(tokens.span(), false);
  EXPECT_EQ(ShowTree(node), "with_stmt(with atom(( testlist_comp(a , b) )) : pass)");
  ParserFor(kPy3).DiscardNode(node);
}

TEST(Feeding, ALineOnWhichNothingIsLeftGivesNothing) {
  EXPECT_EQ(Parse3(""), "null");
  EXPECT_EQ(Parse3("# only"), "null");
  EXPECT_EQ(Parse3("\\\n# only"), "null");
  const std::vector<Token> removed(3);
  EXPECT_EQ(ParserFor(kPy3).ParseToksToNode(removed, false, PositionView()), nullptr);
}

TEST(Feeding, RemovedTokensKeepTheIndicesOfTheOthers) {
  const Tokens tokens("a b + c");
  std::vector<Token> toks(tokens.span().begin(), tokens.span().end());
  toks[0] = Token{};
  CNode* node = ParserFor(kPy3).ParseToksToNode(toks, false, tokens.positions());
  EXPECT_EQ(ShowTree(node), "arith_expr(b + c)");
  EXPECT_EQ(ShowContexts(node), "1 2 3");
  ParserFor(kPy3).DiscardNode(node);
}

TEST(Feeding, AsyncAndAwaitAreNamesInFrontOf37OutsideOfAsyncFunctions) {
  const auto parser = Python3Parser({{3, 6, 0}, 3});
  EXPECT_EQ(ParseWith(*parser, "async = 1"), "expr_stmt(async = 1)");
  EXPECT_EQ(ParseWith(*parser, "await x"), "error at 1");
  EXPECT_EQ(ParseWith(*parser, "async def f(): pass"), "async_stmt(async funcdef(def f parameters(( )) : pass))");
  EXPECT_EQ(ParseWith(*parser, "async # c\\\ndef f(): pass"),
            "async_stmt(async funcdef(def f parameters(( )) : pass))");
  EXPECT_EQ(ParseWith(*parser, "async for x in y: pass"), "error at 1");
  EXPECT_EQ(ParseWith(*parser, "await x", true), "atom_expr(await x)");
  EXPECT_EQ(ParseWith(*parser, "async for x in y: pass", true), "async_stmt(async for_stmt(for x in y : pass))");
  EXPECT_EQ(ParseWith(*parser, "async = 1", true), "error at 1");
}

TEST(Feeding, AsyncAndAwaitAreKeywordsFrom37On) {
  EXPECT_EQ(Parse3("async = 1"), "error at 1");
  EXPECT_EQ(Parse3("await x"), "atom_expr(await x)");
  EXPECT_EQ(Parse3("async with a as b: pass"), "async_stmt(async with_stmt(with with_item(a as b) : pass))");
}

TEST(Feeding, AnEllipsisIsThreeDotsToTheOlderGrammar) {
  EXPECT_EQ(Parse2("x[...]"), "power(x trailer([ subscript(. . .) ]))");
  EXPECT_EQ(Parse2("... x"), "error at 0");
  EXPECT_EQ(Parse3("..."), "...");
}

TEST(Feeding, TheOlderGrammarHasItsOwnStatements) {
  EXPECT_EQ(Parse2("print >>f, x"), "print_stmt(print >> f , x)");
  EXPECT_EQ(Parse2("exec x in y"), "exec_stmt(exec x in y)");
  EXPECT_EQ(Parse2("except A, e:"), "try_stmt(try : pass except_clause(except A , e) : pass)");
  EXPECT_EQ(Parse2("async = 1"), "expr_stmt(async = 1)");
}

TEST(Feeding, AnErrorTokenIsRejectedInItsPlace) {
  EXPECT_EQ(Parse3("x = \"abc"), "error at 2");
  const Tokens nul(Text("a\0b", 3));
  EXPECT_THROW(ParserFor(kPy3).ParseTokenListToNode(nul.span(), false), ParseError);
}

TEST(Feeding, AFailureLeavesAParserThatParsesOn) {
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(Parse3("f(a, [b, (c"), "error at 9");
    EXPECT_EQ(Parse3("f(a)"), "atom_expr(f trailer(( a )))");
  }
}

TEST(Feeding, NodesOfFailedParsesAreUsedAgain) {
  CPGenParserImpl& parser = ParserFor(kPy3);
  for (int i = 0; i < 3; ++i) Parse3("f(a, [b, {c: d}, (e");
  const size_t count = parser.factory().pool().node_count();
  for (int i = 0; i < 1000; ++i) Parse3("f(a, [b, {c: d}, (e");
  EXPECT_EQ(parser.factory().pool().node_count(), count);
}

// ---- finding ----

TEST(Finding, SignificantTokensAreNeitherRemovedNorEmptyNorSkipped) {
  const Tokens tokens("a # c\n\\\nb");
  std::vector<Token> toks(tokens.span().begin(), tokens.span().end());
  ASSERT_EQ(toks.size(), 4u);
  toks.insert(toks.begin() + 1, Token{});
  toks.insert(toks.begin() + 1, Token{"", 0, tok::ERRORTOKEN});
  using Parser = CPGenParserImpl;
  EXPECT_EQ(Parser::FindNextNonSkipIndex(toks, -1), 0);
  EXPECT_EQ(Parser::FindNextNonSkipIndex(toks, 0), 5);
  EXPECT_EQ(Parser::FindNextNonSkipIndex(toks, 5), 6);
  EXPECT_EQ(Parser::FindPrevNonSkipIndex(toks, 5), 0);
  EXPECT_EQ(Parser::FindPrevNonSkipIndex(toks, 100), 5);
  EXPECT_EQ(Parser::FindPrevNonSkipIndex(toks, 0), 6);
}

TEST(Finding, NestedTokensAreNotFound) {
  const Tokens tokens("a , ( b , c ) , d )");
  const auto find = [&](Text text, int64_t start, int64_t end) {
    return CPGenParserImpl::NonNestedFindTokenIndex(text, tokens.span(), start, end);
  };
  EXPECT_EQ(find(",", 0, 10), 1);
  EXPECT_EQ(find(",", 2, 10), 7);
  EXPECT_EQ(find(")", 0, 10), 9);
  EXPECT_EQ(find(")", 3, 10), 6);
  EXPECT_EQ(find("(", 0, 10), 2);
  EXPECT_EQ(find("d", 0, 8), -1);
  EXPECT_EQ(find("a", 1, 1), -1);
  EXPECT_EQ(find("d", 3, 10), -1);
}

TEST(Finding, ARemovedTokenInTheWayIsATypeError) {
  const std::vector<Token> toks(2);
  EXPECT_THROW(CPGenParserImpl::NonNestedFindTokenIndex("x", toks, 0, 2), Error);
  EXPECT_THROW(NextNonRemovedTokenInTuple(toks, 0), Error);
  EXPECT_EQ(NextNonRemovedTokenInTuple(toks, 2), nullptr);
  const std::vector<Token> empty{Token{"", 0, tok::ERRORTOKEN}};
  try {
    NextNonRemovedTokenInTuple(empty, 0);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kIndexError);
  }
}

TEST(Finding, ABackslashIsAContinuationByThePositionBehindIt) {
  const std::vector<Position> stored{{0, 0}, {0, 2}, {1, 0}, {1, 2}};
  const PositionView positions(stored);
  EXPECT_FALSE(CPGenParserImpl::ShouldSkipSlash(0, &positions));
  EXPECT_TRUE(CPGenParserImpl::ShouldSkipSlash(1, &positions));
  EXPECT_TRUE(CPGenParserImpl::ShouldSkipSlash(3, &positions));
  EXPECT_FALSE(CPGenParserImpl::ShouldSkipSlash(4, &positions));
  EXPECT_TRUE(CPGenParserImpl::ShouldSkipSlash(4, nullptr));
}

// ---- special cases ----

TEST(SpecialCases, AParenthesizedWithIsReadWithoutItsBrackets) {
  EXPECT_EQ(Parse3("with (a): pass"), Parse3("with a: pass"));
  EXPECT_EQ(Parse3("with (a, b,): pass"), "with_stmt(with a , b : pass)");
  EXPECT_EQ(Parse3("with (open(a) as f, open(b) as g,):"), Parse3("with open(a) as f, open(b) as g:"));
  EXPECT_EQ(Parse3("with (a, b) as c:"), Parse3("with a, b as c:"));
  EXPECT_EQ(Parse3("with (a).b:"), Parse3("with a .b:"));
  EXPECT_EQ(Parse3("with (a # c\n, b # d\n):"), Parse3("with a, b:"));
  EXPECT_EQ(Parse3("with (): pass"), "error at 3");
  EXPECT_EQ(Parse3("with (a: pass"), "error at 3");
  EXPECT_EQ(Parse3("with (x for x in y): pass"), "error at 3");
  EXPECT_EQ(Parse3("with"), "error at 1");
}

TEST(SpecialCases, AnExceptStarIsReadWithoutItsStar) {
  EXPECT_EQ(Parse3("except *E as e:"), Parse3("except E as e:"));
  EXPECT_EQ(Parse3("except *:"), "error at 1");
  EXPECT_EQ(Parse3("except *"), "error at 1");
}

TEST(SpecialCases, TypeParametersWrapTheStatement) {
  EXPECT_EQ(Parse3("def f[T, *Ts, **P](x): pass"),
            "CWithTypeParameters(CTypeParameter(T) CTypeParameter(* Ts) CTypeParameter(** P) "
            "funcdef(def f parameters(( x )) : pass))");
  EXPECT_EQ(Parse3("class C[T: int]: pass"), "CWithTypeParameters(CTypeParameter(T : int) classdef(class C : pass))");
  EXPECT_EQ(Parse3("async def f[T](): pass"),
            "CWithTypeParameters(CTypeParameter(T) async_stmt(async funcdef(def f parameters(( )) : pass)))");
  EXPECT_EQ(Parse3("type X = int"), "expr_stmt(X = int)");
  EXPECT_EQ(Parse3("type X[T] = list[T]"),
            "CWithTypeParameters(CTypeParameter(T) expr_stmt(X = atom_expr(list trailer([ T ]))))");
  EXPECT_EQ(Parse3("def f[](): pass"), "CWithTypeParameters(funcdef(def f parameters(( )) : pass))");
  EXPECT_EQ(Parse3("def f[T,](): pass"),
            "CWithTypeParameters(CTypeParameter(T) funcdef(def f parameters(( )) : pass))");
  EXPECT_EQ(Parse3("def f[T: (int, str)](): pass"),
            "CWithTypeParameters(CTypeParameter(T : atom(( testlist_comp(int , str) ))) "
            "funcdef(def f parameters(( )) : pass))");
}

TEST(SpecialCases, WhatIsNoTypeStatementIsLeftAlone) {
  EXPECT_EQ(Parse3("type = 5"), "expr_stmt(type = 5)");
  EXPECT_EQ(Parse3("type(x)"), "atom_expr(type trailer(( x )))");
  EXPECT_EQ(Parse3("type: int = 5"), "expr_stmt(type annassign(: int = 5))");
  EXPECT_EQ(Parse3("type X"), "error at 1");
}

TEST(SpecialCases, ABoundIsParsedInItsPlace) {
  const Tokens tokens("def f[T: a.b, U: c](): pass");
  CNode* node = ParserFor(kPy3).ParseToksToNode(tokens.span(), false, tokens.positions());
  EXPECT_EQ(ShowContexts(node), "3 4 5 6 7 9 10 11 0 1 13 14 15 16");
  ParserFor(kPy3).DiscardNode(node);
  EXPECT_EQ(Parse3("def f[T: a b](): pass"), "error at 6");
  EXPECT_EQ(Parse3("def f[T: a, U: (](): pass"), "error at 2");
  // Behind the last token of the bound.
  EXPECT_EQ(Parse3("def f[T: a, U: +](): pass"), "error at 10");
}

TEST(SpecialCases, ARejectionInAMatchThatIsABoundPointsIntoTheBound) {
  EXPECT_EQ(Parse3("match x y:"), "error at 2");
  EXPECT_EQ(Parse3("class C[T: match x y:]: pass"), "error at 7");
  EXPECT_EQ(Parse3("class C[T: def f[U: match x y:]: pass]: pass"), "error at 12");
  // A pattern's has a position, which is that of the source anyhow.
  EXPECT_EQ(Parse3("class C[T: case 1 2:]: pass"), "error at 0:18");
}

TEST(SpecialCases, BadTypeParametersAreRejectedWhereTheyStopMakingSense) {
  const Case cases[] = {
      {"def f[T(x): pass", "error at 2"},  // the bracket is not closed
      {"def f[1](): pass", "error at 3"},   {"def f[T = int](): pass", "error at 4"},
      {"def f[T U](): pass", "error at 4"}, {"def f[*](): pass", "error at 3"},
      {"def f[* 1](): pass", "error at 3"}, {"class C[,]: pass", "classdef"},
      {"type X[T", "error at 2"},
  };
  for (const Case& c : cases) {
    if (Text(c.result) == "classdef")
      EXPECT_EQ(Parse3(c.source), "CWithTypeParameters(classdef(class C : pass))") << c.source;
    else
      EXPECT_EQ(Parse3(c.source), c.result) << c.source;
  }
}

TEST(SpecialCases, ABoundOfCommentsOnlyCountsAsNone) {
  EXPECT_EQ(Parse3("def f[T: # later\n](): pass"),
            "CWithTypeParameters(CTypeParameter(T) funcdef(def f parameters(( )) : pass))");
}

TEST(SpecialCases, BoundsNestToALimit) {
  const auto nested = [](int depth) {
    std::string text = "int";
    for (int i = 0; i < depth; ++i) text = "def f[T: " + text + "](): pass";
    return text;
  };
  EXPECT_NE(Parse3(nested(kMaxBoundDepth)).find("CWithTypeParameters"), std::string::npos);
  // The first colon of each level is the fifth of its tokens.
  EXPECT_EQ(Parse3(nested(kMaxBoundDepth + 1)), "error at " + std::to_string(kMaxBoundDepth * 5 + 4));
  EXPECT_EQ(Parse3(nested(20000)), "error at " + std::to_string(kMaxBoundDepth * 5 + 4));
}

TEST(SpecialCases, ALongListOfTypeParametersTakesLinearTime) {
  std::string text = "def f[";
  for (int i = 0; i < 50000; ++i) text += "T: int, ";
  text += "](): pass";
  const Tokens tokens(text);
  CNode* node = ParserFor(kPy3).ParseToksToNode(tokens.span(), false, tokens.positions());
  EXPECT_EQ(node->ChildCount(), 50001u);
  ParserFor(kPy3).DiscardNode(node);
}

std::string TypeParameterNames(Text text) {
  const Tokens tokens(text);
  std::string names;
  for (CNode* node : ParserFor(kPy3).GetTypeParameterNodes(tokens.span())) {
    names += ShowTree(node) + ";";
    ParserFor(kPy3).DiscardNode(node);
  }
  return names;
}

TEST(TypeParameterNodes, NamesAreFoundOnLinesThatDoNotParse) {
  EXPECT_EQ(TypeParameterNames("def f[T, *Ts, **P](x"), "CTypeParameter(T);CTypeParameter(* Ts);CTypeParameter(** P);");
  EXPECT_EQ(TypeParameterNames("async def f[T] 1 2"), "CTypeParameter(T);");
  EXPECT_EQ(TypeParameterNames("class C[T, 1, U, V W]"), "CTypeParameter(T);CTypeParameter(U);");
  EXPECT_EQ(TypeParameterNames("type X[T]"), "CTypeParameter(T);");
}

TEST(TypeParameterNodes, OtherShapesHaveNone) {
  for (const char* text :
       {"", "# c", "async", "x = 1", "def", "def 1", "def f", "def f(x)", "class C:", "type X = 1", "async x"})
    EXPECT_EQ(TypeParameterNames(text), "") << text;
}

TEST(TypeParameterNodes, AnOpenBracketIsRaised) { EXPECT_THROW(TypeParameterNames("def f[T(x)"), ParseError); }

TEST(TypeParameterNodes, ABoundNeedsPositions) {
  try {
    TypeParameterNames("def f[T: int](x)");
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kTypeError);
    EXPECT_EQ(error.message(), "'NoneType' object is not subscriptable");
  }
}

TEST(TypeParameterNodes, AStarAtTheEndOfTheTokensIsAnIndexError) {
  const Tokens tokens("def f[*");
  try {
    ParserFor(kPy3).NodesForTypeParameters(tokens.span(), false, nullptr, 2, 4, true);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), ErrorKind::kIndexError);
  }
}

// ---- an engine of the host's ----

class RecordingEngine : public ExternalEngine {
 public:
  void Setup(int start) override { fed += "setup " + std::to_string(start) + ";"; }
  void AddToken(int type, Text value, int32_t context) override {
    fed += std::to_string(type) + " " +
           (IsNone(value)   ? "none"
            : value == "\n" ? "NEWLINE"
                            : std::string(value)) +
           " " + std::to_string(context) + ";";
    if (value == "bad") throw ParseError("bad input", type, value, Context::Index(context));
  }
  CNode* Finish() override { return root; }

  std::string fed;
  CNode* root = nullptr;
};

TEST(HostEngine, TakesTheSameTokensByType) {
  const auto parser = Python3Parser(kPy3);
  RecordingEngine engine;
  parser->set_external_engine(&engine);
  CNodeFactory& factory = parser->factory();
  CNode* children[] = {factory.NewNameNode("x", Context::Index(0)),
                       factory.ConvertSingleNode(tok::ENDMARKER, kNoText, Context::Index(1), nullptr, 0)};
  engine.root = factory.ConvertRule(parser->file_input_number(), children, 2);
  const Tokens tokens("await x # c");
  CNode* node = parser->ParseToksToNode(tokens.span(), false, tokens.positions());
  EXPECT_EQ(ShowTree(node), "x");
  EXPECT_EQ(engine.fed,
            "setup " + std::to_string(parser->file_input_number()) + ";55 await 0;1 x 1;4 NEWLINE 3;0 none 3;");
  parser->DiscardNode(node);
}

TEST(HostEngine, AResultThatIsNotOneStatementIsNothing) {
  const auto parser = Python3Parser(kPy3);
  RecordingEngine engine;
  parser->set_external_engine(&engine);
  engine.root = parser->factory().NewNameNode("x", Context::Index(0));
  const Tokens tokens("x");
  EXPECT_EQ(parser->ParseToksToNode(tokens.span(), false, tokens.positions()), nullptr);
}

// ---- size ----

TEST(Feeding, HugeStatementsParseWithoutDeepRecursion) {
  std::string sum = "x = 1";
  for (int i = 0; i < 100000; ++i) sum += " + 1";
  EXPECT_EQ(Parse3(sum).substr(0, 22), "expr_stmt(x = arith_ex");
  EXPECT_EQ(Parse3(std::string(100000, '(')), "error at 100000");
  EXPECT_EQ(Parse3("x" + std::string(100000, ')')), "error at 1");
}

}  // namespace
}  // namespace quillet
