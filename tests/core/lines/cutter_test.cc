// Logical lines: where statements begin and end, what they are, where they stand; and the record
// that holds one.
#include "lines/cutter.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "lines/future_imports.h"
#include "lines/scopes.h"
#include "lines/unusual_tokens.h"
#include "tests/core/support/verify_tokens.h"

namespace quillet {
namespace {

using Texts = std::vector<std::string>;

struct Cut {
  explicit Cut(Text bytes, Version version = Version::Of(3, 12)) : source(SourceText::Copy(bytes)) {
    CutLines(*source, version, rows);
    EXPECT_EQ(VerifyLines(*source, rows), "");
  }

  // The tokens of a row with blanks between.
  std::string Spell(const LineRow& row) const {
    std::string text;
    for (uint32_t i = 0; i < row.token_count; ++i) {
      if (i > 0) text += ' ';
      text += source->tokens[row.first_token + i].view();
    }
    return text;
  }

  Texts Lines() const {
    Texts texts;
    for (const LineRow& row : rows) texts.push_back(Spell(row));
    return texts;
  }

  Texts Kinds() const {
    Texts kinds;
    for (const LineRow& row : rows) kinds.emplace_back(TextOfLineKind(row.kind));
    return kinds;
  }

  Ref<SourceText> source;
  std::vector<LineRow> rows;
};

Texts LinesOf(Text bytes, Version version = Version::Of(3, 12)) { return Cut(bytes, version).Lines(); }

LineKind KindOf(Text bytes, Version version = Version::Of(3, 12)) {
  const Cut cut(bytes, version);
  EXPECT_EQ(cut.rows.size(), 1u) << bytes;
  return cut.rows[0].kind;
}

LineKind SoftKind(Text bytes) {
  const Ref<SourceText> source = SourceText::Copy(bytes);
  TokenizeOnly(*source, Version::Of(3, 12));
  return FindMatchOrCaseType(source->tokens, 0, source->tokens.size());
}

// ---- the head of a file ----

TEST(FutureImports, OnlyThoseOfTheFutureSwitchThePrintFunctionOn) {
  const auto imports = [](Text bytes) {
    const Cut cut(bytes, Version::Of(2, 7));
    return ImportsPrintFunction(*cut.source, cut.rows);
  };
  EXPECT_TRUE(imports("from __future__ import print_function\n"));
  EXPECT_TRUE(imports("from __future__ import (division,\n  print_function)\n"));
  EXPECT_TRUE(imports("'doc'\n# c\n\nfrom __future__ import division\nfrom __future__ import print_function"));
  EXPECT_FALSE(imports("from x import print_function\n"));
  EXPECT_FALSE(imports("from x import y\nfrom __future__ import print_function\n"));
  EXPECT_FALSE(imports("from __future__ import division\nfrom x import print_function\n"));
  EXPECT_FALSE(imports("import x\nfrom __future__ import print_function\n"));
  EXPECT_FALSE(imports("x = 1\nfrom __future__ import print_function\n"));
  EXPECT_FALSE(imports("from __future__ import division\n"));
  EXPECT_FALSE(imports("from\n"));
  EXPECT_FALSE(imports(""));
}

TEST(Positions, OfPartsEndWithTheWhole) {
  const std::vector<Position> stored = {{1, 2}, {3, 4}, {5, 6}};
  const PositionView positions(stored);
  EXPECT_EQ(positions.Slice(1, 9).size(), 2u);
  EXPECT_EQ(positions.Slice(1, 9)[0].line, 3);
  EXPECT_EQ(positions.Slice(7, 9).size(), 0u);
  EXPECT_EQ(positions.Slice(2, 1).size(), 0u);
}

// ---- lines ----

TEST(Lines, ABodyOnTheLineOfItsHeadIsWhatItWouldBeAlone) {
  EXPECT_EQ(Cut("def f(a=g(1)): x[0] = 1\n").Kinds(), (Texts{"def", "assignment"}));
  EXPECT_EQ(Cut("class A(f(1)): x[(0)]: int\n").Kinds(), (Texts{"class", "assignment"}));
  EXPECT_EQ(Cut("def f(): g(x=1)\n").Kinds(), (Texts{"def", "unknown"}));
}

TEST(Lines, BracketsAndBackslashesJoin) {
  EXPECT_EQ(LinesOf("a = (1,\n  2)\nb = \\\n  3\nc"), (Texts{"a = ( 1 , 2 )", "b = \\ 3", "c"}));
}

TEST(Lines, ABlankLineIsARowWithoutTokens) {
  const Cut cut("a\n\n  \n\f\nb\n");
  EXPECT_EQ(cut.Kinds(), (Texts{"unknown", "blank line", "blank line", "blank line", "unknown"}));
  EXPECT_EQ(cut.rows[2].first_line, 2u);
  EXPECT_EQ(cut.rows[2].token_count, 0u);
}

TEST(Lines, BlankLinesWithinBracketsAreNoRows) { EXPECT_EQ(LinesOf("(a,\n\n\nb)\n"), (Texts{"( a , b )"})); }

TEST(Lines, NothingIsNoRow) {
  EXPECT_TRUE(LinesOf("").empty());
  EXPECT_EQ(Cut("  ").Kinds(), (Texts{"blank line"}));
  EXPECT_EQ(Cut("a\n").rows.size(), 1u);
}

TEST(Lines, CommentsByThemselvesAreLinesAndOthersBelongToTheirStatement) {
  const Cut cut("# one\na = (1, # two\n  # three\n 2) # four\n");
  EXPECT_EQ(cut.Lines(), (Texts{"# one", "a = ( 1 , # two # three 2 ) # four"}));
  EXPECT_EQ(cut.Kinds(), (Texts{"comment", "assignment"}));
}

TEST(Lines, ABackslashAtTheEndIsAPlainToken) {
  EXPECT_EQ(LinesOf("a \\"), (Texts{"a \\"}));
  EXPECT_EQ(LinesOf("a \\\n"), (Texts{"a \\"}));
  EXPECT_EQ(LinesOf("a \\\n\nb"), (Texts{"a \\", "b"}));
}

TEST(Lines, RowsKnowTheirLinesAndIndentation) {
  const Cut cut("if x:\n\ty = [1,\n2]\n        z\n");
  ASSERT_EQ(cut.rows.size(), 3u);
  EXPECT_EQ(cut.rows[1].first_line, 1u);
  EXPECT_EQ(cut.rows[1].last_line, 2u);
  EXPECT_EQ(cut.rows[1].indent, 8u);
  EXPECT_EQ(cut.rows[2].indent, 8u);
  EXPECT_EQ(Cut(" \tx").rows[0].indent, 8u);
  EXPECT_EQ(Cut("   \f  x").rows[0].indent, 2u);
}

// ---- ";" ----

TEST(Separators, CutStatementsApart) {
  const Cut cut("  a; b = 1 ;c # d\n");
  EXPECT_EQ(cut.Lines(), (Texts{"a", "b = 1", "c # d"}));
  EXPECT_FALSE(cut.rows[0].continues_physical_line);
  EXPECT_TRUE(cut.rows[1].continues_physical_line);
  EXPECT_TRUE(cut.rows[2].continues_physical_line);
  EXPECT_EQ(cut.rows[2].indent, 2u);
}

TEST(Separators, ATrailingOneLeavesNothing) {
  EXPECT_EQ(LinesOf("a;\nb;"), (Texts{"a", "b"}));
  EXPECT_EQ(LinesOf("a; # c\nb"), (Texts{"a # c", "b"}));
  EXPECT_EQ(LinesOf("a; \\\n # c\nb"), (Texts{"a \\ # c", "b"}));
}

TEST(Separators, AnEmptyStatementKeepsItsOwn) {
  EXPECT_EQ(LinesOf(";"), (Texts{";"}));
  EXPECT_EQ(LinesOf("x;;y"), (Texts{"x", ";", "y"}));
  EXPECT_EQ(LinesOf(";x"), (Texts{";", "x"}));
  EXPECT_EQ(LinesOf("if x: ;"), (Texts{"if x :", ";"}));
  EXPECT_EQ(LinesOf("def f(): ; x"), (Texts{"def f ( ) :", ";", "x"}));
}

TEST(Separators, WithinBracketsAreTokens) { EXPECT_EQ(LinesOf("(a; b)"), (Texts{"( a ; b )"})); }

TEST(Separators, LeaveTheFirstStatementWithItsHead) { EXPECT_EQ(LinesOf("if x: a; b"), (Texts{"if x : a", "b"})); }

TEST(Separators, KnowTheLineThatAStatementBehindALongStringStandsOn) {
  const Cut cut("a = '''x\ny'''; b\nc");
  EXPECT_EQ(cut.rows[1].first_line, 1u);
  EXPECT_EQ(cut.rows[2].first_line, 2u);
}

// ---- bodies on the line ----

TEST(InlineBodies, OfDefinitionsAreCutOff) {
  const Cut cut("def f(): a; b\nclass C: pass # c\nasync def g(x: int = (lambda: 1)) -> T: return x");
  EXPECT_EQ(cut.Lines(), (Texts{"def f ( ) :", "a", "b", "class C :", "pass # c",
                                "async def g ( x : int = ( lambda : 1 ) ) -> T :", "return x"}));
  EXPECT_EQ(cut.Kinds(), (Texts{"def", "unknown", "unknown", "class", "pass", "def", "return"}));
  EXPECT_TRUE(cut.rows[0].has_inline_body);
  EXPECT_FALSE(cut.rows[0].continues_physical_line);
  EXPECT_TRUE(cut.rows[1].continues_physical_line);
  EXPECT_TRUE(cut.rows[2].continues_physical_line);
  EXPECT_TRUE(cut.rows[5].is_async);
}

TEST(InlineBodies, ACommentBehindTheHeadIsNone) {
  const Cut cut("def f(): # type: () -> int\n  pass");
  EXPECT_EQ(cut.Lines(), (Texts{"def f ( ) : # type: () -> int", "pass"}));
  EXPECT_FALSE(cut.rows[0].has_inline_body);
}

TEST(InlineBodies, ALambdaKeepsItsColon) {
  EXPECT_EQ(LinesOf("def f() -> lambda: 0: x"), (Texts{"def f ( ) -> lambda : 0 :", "x"}));
}

TEST(InlineBodies, OfOtherStatementsStay) {
  for (const char* line : {"if x: y", "else: y", "for a in b: y", "while x: y", "with a as b: y", "try: y",
                           "except E: y", "finally: y", "elif x: y", "async for a in b: y", "case 1: y"}) {
    EXPECT_EQ(Cut(line).rows.size(), 1u) << line;
  }
}

TEST(InlineBodies, OnALaterLineKnowTheirLine) {
  const Cut cut("def f(a,\n  b): return a\n");
  EXPECT_EQ(cut.rows[0].last_line, 1u);
  EXPECT_EQ(cut.rows[1].first_line, 1u);
}

// ---- recovery ----

TEST(Recovery, ABracketLeftOpenEndsAtAStatement) {
  for (const char* next :
       {"class A: pass",   "def f(): pass", "return",   "import a", "while x: y", "try:",
        "raise",           "del x",         "pass",     "break",    "continue",   "global x",
        "assert x",        "except E:",     "finally:", "elif x:",  "with a: b",  "async def f(): pass",
        "async with a: b", "nonlocal x"}) {
    const Cut cut(std::string("x = (1,\n") + next + "\ny = 1\n");
    ASSERT_GE(cut.rows.size(), 3u) << next;
    EXPECT_EQ(cut.Spell(cut.rows[0]), "x = ( 1 ,");
    EXPECT_EQ(cut.Spell(cut.rows.back()), "y = 1");
    EXPECT_EQ(cut.rows[0].last_line, 0u);
  }
}

TEST(Recovery, DeeperLinesAndWordsOfExpressionsGoOn) {
  for (const char* next : {"if x", "for x in y", "else z", "lambda: 0", "not x", "yield", "await x", "async for x in y",
                           "from x", "match", "print", "classes", "x"}) {
    EXPECT_EQ(Cut(std::string("x = (1\n") + next + "\n)\n").rows.size(), 1u) << next;
  }
  EXPECT_EQ(LinesOf("x = (1,\n  import y\n"), (Texts{"x = ( 1 , import y"}));
}

TEST(Recovery, ComparesWithTheIndentationOfTheStatement) {
  EXPECT_EQ(LinesOf("if a:\n    f(b,\n  return 1\n"), (Texts{"if a :", "f ( b ,", "return 1"}));
  EXPECT_EQ(LinesOf("if a:\n    f(b,\n    return 1\n"), (Texts{"if a :", "f ( b ,", "return 1"}));
}

TEST(Recovery, NonlocalIsANameInPython2) {
  EXPECT_EQ(LinesOf("x = (\nnonlocal\n)", Version::Of(2, 7)), (Texts{"x = ( nonlocal )"}));
}

TEST(Recovery, AClosingBracketTooManyChangesNothing) {
  EXPECT_EQ(LinesOf("a)\nb]}\n(c\nd)"), (Texts{"a )", "b ] }", "( c d )"}));
}

TEST(Recovery, AnUnclosedStringSpoilsOnlyItsLine) {
  EXPECT_EQ(LinesOf("a = 'x\nb = \"\"\"y\nc = 1\n"), (Texts{"a = 'x", "b = \"\"\"y", "c = 1"}));
}

// ---- kinds ----

TEST(Kinds, OfEveryStatement) {
  const std::vector<std::pair<const char*, LineKind>> cases = {
      {"class A(B):", LineKind::kClassDef},
      {"def f(a, b=1):", LineKind::kFunctionDef},
      {"async def f():", LineKind::kFunctionDef},
      {"'doc'", LineKind::kStringExpression},
      {"'a' \"b\" # c", LineKind::kStringExpression},
      {"'a' % b", LineKind::kUnknown},
      {"a = 1", LineKind::kAssignment},
      {"a.b[c] = d = e", LineKind::kAssignment},
      {"a += 1", LineKind::kAssignment},
      {"a >>= 1", LineKind::kAssignment},
      {"a @= b", LineKind::kAssignment},
      {"a //= b", LineKind::kAssignment},
      {"a: int", LineKind::kAssignment},
      {"a: int = 1", LineKind::kAssignment},
      {"f(a=1)", LineKind::kUnknown},
      {"a == b", LineKind::kUnknown},
      {"a -> b", LineKind::kUnknown},
      {"x[a:b]", LineKind::kUnknown},
      {"lambda: 0", LineKind::kUnknown},
      {"lambda x=1: x", LineKind::kUnknown},
      {"a = lambda: 0", LineKind::kAssignment},
      {"f(lambda: 0).x = 1", LineKind::kAssignment},
      {"a or lambda: 0", LineKind::kUnknown},
      {"if x:", LineKind::kIfBeginning},
      {"else:", LineKind::kElseBeginning},
      {"elif x:", LineKind::kElifBeginning},
      {"while x:", LineKind::kWhileBeginning},
      {"for x in y:", LineKind::kForBeginning},
      {"async for x in y:", LineKind::kForBeginning},
      {"pass", LineKind::kPass},
      {"raise x", LineKind::kRaise},
      {"try:", LineKind::kTry},
      {"except E as e:", LineKind::kExcept},
      {"finally:", LineKind::kFinally},
      {"assert x", LineKind::kAssert},
      {"return x", LineKind::kReturn},
      {"import a", LineKind::kImport},
      {"from a import b", LineKind::kFromImport},
      {"del x", LineKind::kDelete},
      {"break", LineKind::kBreak},
      {"continue", LineKind::kContinue},
      {"with x:", LineKind::kWith},
      {"async with x:", LineKind::kWith},
      {"match x:", LineKind::kMatch},
      {"case x:", LineKind::kCase},
      {"type X = int", LineKind::kTypeStatement},
      {"type X[T] = int", LineKind::kTypeStatement},
      {"type match = int", LineKind::kTypeStatement},
      {"type case = int", LineKind::kTypeStatement},
      {"type cast = int", LineKind::kTypeStatement},
      {"type exec = int", LineKind::kTypeStatement},
      {"type print = int", LineKind::kTypeStatement},
      {"type type = int", LineKind::kTypeStatement},
      {"type _[T] = int", LineKind::kTypeStatement},
      {"type = 1", LineKind::kAssignment},
      {"type(x)", LineKind::kUnknown},
      {"type in [x]", LineKind::kUnknown},
      {"match = 1", LineKind::kAssignment},
      {"case(x)", LineKind::kUnknown},
      {"# c", LineKind::kComment},
      {"global x", LineKind::kUnknown},
      {"yield x", LineKind::kUnknown},
      {"async = 1", LineKind::kAssignment},
      {"@deco(a=1)", LineKind::kUnknown},
      {"\\\nimport a", LineKind::kImport},
  };
  for (const auto& [text, kind] : cases) EXPECT_EQ(KindOf(text), kind) << text;
}

TEST(Kinds, PrintIsAStatementInPython2Only) {
  EXPECT_EQ(KindOf("print x", Version::Of(2, 7)), LineKind::kPrint);
  EXPECT_EQ(KindOf("print >>f, x", Version::Of(2, 7)), LineKind::kPrint);
  EXPECT_EQ(KindOf("print", Version::Of(2, 7)), LineKind::kPrint);
  EXPECT_EQ(KindOf("print = 1", Version::Of(2, 7)), LineKind::kAssignment);
  EXPECT_EQ(KindOf("print(x)", Version::Of(3, 8)), LineKind::kUnknown);
}

TEST(Kinds, HaveTexts) {
  for (int i = 0; i < static_cast<int>(LineKind::kOther); ++i) {
    const auto kind = static_cast<LineKind>(i);
    EXPECT_FALSE(TextOfLineKind(kind).empty());
    EXPECT_EQ(LineKindOfText(TextOfLineKind(kind)), kind);
  }
  EXPECT_EQ(LineKindOfText("a host's own"), LineKind::kOther);
  EXPECT_EQ(TextOfLineKind(LineKind::kOther), "");
}

// ---- match and case ----

TEST(SoftKeywords, MatchStatementsAreFound) {
  for (const char* text :
       {"match x:",       "match (x):",   "match(x):",        "match [a, b]:",        "match[x]:",     "match -x:",
        "match *a, b:",   "match not x:", "match lambda: x:", "match x if y else z:", "match {1: 2}:", "match 's':",
        "match x[1:2]:",  "match x: # c", "match \\\n x:",    "match x.y(z):",        "match match:",  "match x, y:",
        "match await x:", "match ...:",   "match x:\\",       "match (x := y):",      "match ~x:",     "match case:"}) {
    EXPECT_EQ(SoftKind(text), LineKind::kMatch) << text;
  }
}

TEST(SoftKeywords, CaseStatementsAreFoundWithAndWithoutABody) {
  for (const char* text : {"case x:",
                           "case _:",
                           "case (x):",
                           "case [a, b]:",
                           "case [a, *b]: pass",
                           "case {'k': v}:",
                           "case A(x=1):",
                           "case 1 | 2:",
                           "case -1:",
                           "case 's':",
                           "case x if y:",
                           "case x if lambda: y: z",
                           "case a.b:",
                           "case a as b:",
                           "case x: y = 1",
                           "case (1): f()",
                           "case(x): return",
                           "case [x]: y = 3",
                           "case [x]: return",
                           "case[x]: return y",
                           "case[x]: y += 1",
                           "case[x]: y = z = 1",
                           "case[x]: y: z",
                           "case[x]: y, z = 1",
                           "case[x]: *y, z = 1",
                           "case[x]: yield y",
                           "case[]: y",
                           "case *a, b: c",
                           "case x, y: z",
                           "case None: pass",
                           "case case: pass",
                           "case A(): x: int = 1",
                           "case [[a]]: b"}) {
    EXPECT_EQ(SoftKind(text), LineKind::kCase) << text;
  }
}

TEST(SoftKeywords, OrdinaryStatementsAreNot) {
  for (const std::string name : {"match", "case"}) {
    for (const char* rest : {"",
                             " = 1",
                             "(x)",
                             "[x]",
                             ".x",
                             "[x]: int",
                             "[x]: int = 3",
                             "[x]: int = 3, 4",
                             ": int",
                             ": int = 3",
                             ".x: int = 1",
                             ", y = z",
                             " in x",
                             " or y",
                             " -x",
                             " * y",
                             "(x).y: int",
                             "(x)[0]: int",
                             "[x][y]: int",
                             "[x].y: int",
                             " += 1",
                             " if x else y",
                             " = lambda: 0",
                             ", lambda: 0",
                             " or lambda x: 0",
                             " = {1: 2}",
                             "(x, y=lambda: 0)",
                             " is not x",
                             "; y",
                             ":",
                             "[1:2]",
                             "[1:2] = x",
                             "[lambda: 0]: int",
                             ": lambda: 0",
                             " and x[1:]",
                             ".\\\nx: int"}) {
      EXPECT_EQ(SoftKind(name + rest), LineKind::kUnknown) << name << rest;
    }
  }
  EXPECT_EQ(SoftKind("match x: pass"), LineKind::kUnknown);
  EXPECT_EQ(SoftKind("print(match)"), LineKind::kUnknown);
  EXPECT_EQ(SoftKind(""), LineKind::kUnknown);
  EXPECT_EQ(SoftKind("# match x:"), LineKind::kUnknown);
}

TEST(SoftKeywords, LookOnlyAtTheTokensGiven) {
  const Ref<SourceText> source = SourceText::Copy("x match y: z");
  TokenizeOnly(*source, Version::Of(3, 12));
  EXPECT_EQ(FindMatchOrCaseType(source->tokens, 1, 4), LineKind::kMatch);
  EXPECT_EQ(FindMatchOrCaseType(source->tokens, 1, 3), LineKind::kUnknown);
  EXPECT_EQ(FindMatchOrCaseType(source->tokens, 4, 99), LineKind::kUnknown);
  EXPECT_EQ(FindMatchOrCaseType(source->tokens, 99, 100), LineKind::kUnknown);
  source->tokens[2] = Token();
  EXPECT_EQ(FindMatchOrCaseType(source->tokens, 1, 4), LineKind::kUnknown);
}

// ---- embedded expressions ----

TEST(Embedded, MostLinesAreKnownToHoldNone) {
  for (const char* text : {"x = 1", "x = 'a'", "f('a', b)", "if x == 'a':", "def f(a='b'):", "# c", "x = {'a': 'b'}",
                           "x['a':'b']", "'doc'", "return 'a'", "x = r'a'", "class A(B['x']):"}) {
    EXPECT_TRUE(Cut(text).rows[0].no_embedded) << text;
  }
}

TEST(Embedded, LinesThatMayHoldSomeAreNotRuledOut) {
  for (const char* text : {"x = f'a'", "x = Rf'a'", "def f(a: 'T'):", "def f() -> 'T':", "x: 'T' = 1", "x: List['T']",
                           "cast('T', x)", "y = typing.cast(List['T'], x)", "x = 1 # type: int", "# type: () -> int",
                           "if x: y: 'T' = 1", "class A[T: 'B']:", "type X = 'T'", "x = (1, # type: int\n 2)"}) {
    EXPECT_FALSE(Cut(text).rows[0].no_embedded) << text;
  }
}

TEST(Embedded, ABodyOnTheLineIsJudgedByItself) {
  const Cut cut("def f(a='x'): y = f'a'\ndef g(a: 'T'): y = 'a'");
  EXPECT_TRUE(cut.rows[0].no_embedded);
  EXPECT_FALSE(cut.rows[1].no_embedded);
  EXPECT_FALSE(cut.rows[2].no_embedded);
  EXPECT_TRUE(cut.rows[3].no_embedded);
}

TEST(Embedded, ATypeCommentBehindASeparatorCounts) { EXPECT_FALSE(Cut("x = 1; # type: int").rows[0].no_embedded); }

// ---- scopes ----

// One character a row: "." outside, "a" in an async def, "f" first in a def, "b" both.
std::string PlacesOf(Text bytes) {
  const Cut cut(bytes);
  ScopeTracker scopes;
  std::string places;
  for (const LineRow& row : cut.rows) {
    LinePlace place;
    scopes.Next(row, place);
    places += place.in_async_def ? (place.first_in_def ? 'b' : 'a') : (place.first_in_def ? 'f' : '.');
  }
  return places;
}

TEST(Scopes, TheFirstStatementOfAFunctionIsFirst) {
  EXPECT_EQ(PlacesOf("def f():\n  a\n  b\nc"), ".f..");
  EXPECT_EQ(PlacesOf("class A:\n  a\n  def f():\n    b\n  c"), "...f.");
}

TEST(Scopes, BlankLinesDoNotCountAndCommentsLeaveTheStatementFirst) {
  EXPECT_EQ(PlacesOf("def f():\n\n  # type: () -> int\n\n  # c\n  a\n  # d\n  b"), "..f.ff..");
}

TEST(Scopes, CommentsFurtherOutEndNothing) {
  EXPECT_EQ(PlacesOf("async def f():\n  a\n# c\n  b\nc"), ".baa.");
  EXPECT_EQ(PlacesOf("def f():\n# type: () -> int\n  a"), ".ff");
}

TEST(Scopes, AsyncHoldsInBlocksAndNotInDefinitions) {
  EXPECT_EQ(PlacesOf("async def f():\n  if x:\n    a\n  def g():\n    b\n  c\n  class D:\n    d\n  e\nf"),
            ".baafaa.a.");
  EXPECT_EQ(PlacesOf("def f():\n  async def g():\n    a\n  b"), ".fb.");
}

TEST(Scopes, BodiesOnTheLineEndWithIt) {
  EXPECT_EQ(PlacesOf("async def f(): a; b\nc"), ".ba.");
  EXPECT_EQ(PlacesOf("async def f(): a\n# c\n"), ".b.");
  EXPECT_EQ(PlacesOf("async def f():\n  def g(): a; b\n  c"), ".bf.a");
}

// ---- the record ----

TEST(LogicalLines, ShowARow) {
  const Cut cut("a\n\nb = [1,\n  2]\n");
  LogicalLine line;
  SetFromRow(line, cut.source, cut.rows[2]);
  EXPECT_EQ(line.kind, LineKind::kAssignment);
  EXPECT_EQ(line.first_line, 2);
  EXPECT_EQ(line.token_count, 7);
  ASSERT_EQ(line.positions().size(), 7u);
  EXPECT_EQ(line.positions()[0], (Position{0, 0}));
  EXPECT_EQ(line.positions()[5], (Position{1, 2}));
  EXPECT_EQ(line.positions().LineOf(6), 1);
  EXPECT_EQ(line.positions().First(2).size(), 2u);
  EXPECT_EQ(line.positions().Slice(5, 7)[0], (Position{1, 2}));
  EXPECT_EQ(line.positions().Slice(6, 99).size(), 1u);
  EXPECT_EQ(TextFromTokens(line), "b = [1,\n  2]");
}

TEST(LogicalLines, TellNoPlaceOfWhatIsNotInTheirSource) {
  const Cut cut("a\nb = c\n");
  LogicalLine line;
  SetFromRow(line, cut.source, cut.rows[1]);
  std::vector<Token> tokens(line.toks.begin(), line.toks.end());
  static constexpr char kElsewhere[] = "x";
  tokens[0].text = nullptr;
  tokens[1].text = kElsewhere;
  line.toks = tokens;
  EXPECT_EQ(line.positions()[0], Position());
  EXPECT_EQ(line.positions()[1], Position());
  EXPECT_EQ(line.positions()[2], (Position{0, 4}));
}

TEST(LogicalLines, HoldTheirSourceOrLeaveItToOthers) {
  const Cut cut("a");
  const Ref<SourceText> other = SourceText::Copy("b");
  LogicalLine line;
  SetFromRow(line, *cut.source, cut.rows[0]);
  EXPECT_TRUE(cut.source->IsUnique());
  {
    LogicalLine holding;
    SetFromRow(holding, cut.source, cut.rows[0]);
    EXPECT_FALSE(cut.source->IsUnique());
    EXPECT_EQ(holding.HoldSource(other).get(), cut.source.get());
    EXPECT_EQ(holding.source, other.get());
    EXPECT_FALSE(other->IsUnique());
  }
  EXPECT_TRUE(cut.source->IsUnique());
  EXPECT_TRUE(other->IsUnique());
  EXPECT_EQ(line.source, cut.source.get());
}

TEST(LogicalLines, PositionsOfTheHostReplaceThoseOfTheSource) {
  const Cut cut("a b\nc");
  LogicalLine line;
  SetFromRow(line, cut.source, cut.rows[0]);
  line.SetPositions({{0, 2}, {1, 1}});
  EXPECT_EQ(line.positions()[1], (Position{1, 1}));
  EXPECT_EQ(line.positions().Slice(1, 2)[0], (Position{1, 1}));
  EXPECT_EQ(TextFromTokens(line), "  a\n b");
  SetFromRow(line, cut.source, cut.rows[1]);
  EXPECT_EQ(line.positions().size(), 1u);
}

TEST(LogicalLines, RemovedTokensLeaveBlanks) {
  const Cut cut("ab cd ef");
  LogicalLine line;
  SetFromRow(line, cut.source, cut.rows[0]);
  std::vector<Token> toks(line.toks.begin(), line.toks.end());
  toks[1] = Token();
  EXPECT_EQ(TextFromTokens(toks, line.positions()), "ab    ef");
}

TEST(LogicalLines, TextSpellsIndentationAndLinesWithinTokens) {
  const Cut cut("  x = '''a\r\nb''' + y\n");
  LogicalLine line;
  SetFromRow(line, cut.source, cut.rows[0]);
  EXPECT_EQ(TextFromTokens(line), "  x = '''a\r\nb''' + y");
  EXPECT_EQ(TextFromTokens(LogicalLine()), "");
}

TEST(LogicalLines, TextKeepsItsColumnUpToALineThatNobodyWrites) {
  const Cut cut(std::string(10000, ';'));
  size_t total = 0;
  LogicalLine line;
  for (const LineRow& row : cut.rows) {
    SetFromRow(line, cut.source, row);
    const std::string text = TextFromTokens(line);
    if (row.first_token <= 500) {
      EXPECT_EQ(text, std::string(row.first_token, ' ') + ";");
    }
    total += text.size();
  }
  EXPECT_EQ(cut.rows.size(), 10000u);
  EXPECT_LT(total, cut.rows.size() * 2000);
}

TEST(LogicalLines, TokenTypesAreIndexedAsTheHostsListIs) {
  const Cut cut("if 1: # c");
  LogicalLine line;
  SetFromRow(line, cut.source, cut.rows[0]);
  EXPECT_EQ(line.GetTokType(0), tok::NAME);
  EXPECT_EQ(line.GetTokType(1), tok::NUMBER);
  EXPECT_EQ(line.GetTokType(-1), tok::COMMENT);
  EXPECT_THROW(line.GetTokType(4), Error);
  EXPECT_THROW(line.GetTokType(-5), Error);
}

TEST(LogicalLines, RecordsComeBackInOrderAndAreCleared) {
  LogicalLine line;
  line.ClearDerivedInfo();
  EXPECT_TRUE(line.type_equivs().empty());
  std::string name = "a";
  line.AppendTypeEquiv(name, "x");
  name = "b";
  line.AppendTypeEquiv(name, "y");
  line.AppendArgTypeEquiv("c", "z");
  ASSERT_EQ(line.type_equivs().size(), 2u);
  EXPECT_EQ(line.type_equivs()[0].name(), "a");
  EXPECT_EQ(line.type_equivs()[1].info(), "y");
  ASSERT_EQ(line.arg_type_equivs().size(), 1u);
  line.ClearDerivedInfo();
  EXPECT_TRUE(line.type_equivs().empty());
  EXPECT_TRUE(line.arg_type_equivs().empty());
}

TEST(LogicalLines, LinesOfAFileShareAStore) {
  RecordStore store;
  LogicalLine first, second;
  first.WriteTo(&store);
  first.AppendStableTypeEquiv("a", "x");
  second.WriteTo(&store);
  second.AppendStableTypeEquiv("b", "y");
  second.AppendStableTypeEquiv("c", "z");
  EXPECT_EQ(first.type_equivs().size(), 1u);
  EXPECT_EQ(second.type_equivs()[1].name(), "c");
  second.ClearDerivedInfo();
  EXPECT_EQ(store.rows.size(), 1u);
  EXPECT_EQ(first.type_equivs()[0].name(), "a");
  second.AppendStableTypeEquiv("d", "w");
  first.ClearDerivedInfo();
  EXPECT_EQ(second.type_equivs()[0].name(), "d");
}

TEST(LogicalLines, RecordsAreCopiedWithinOneStoreToo) {
  RecordStore store;
  LogicalLine from, to;
  from.WriteTo(&store);
  for (int i = 0; i < 100; ++i) from.AppendTypeEquiv("n", std::to_string(i));
  to.WriteTo(&store);
  from.CopyTypeEquivsTo(to);
  ASSERT_EQ(to.type_equivs().size(), 100u);
  EXPECT_EQ(to.type_equivs()[99].info(), "99");
}

TEST(LogicalLines, DefinitionsOpenScopes) {
  const auto opens = [](Text text) {
    const Cut cut(text);
    LogicalLine line;
    SetFromRow(line, cut.source, cut.rows[0]);
    const bool by_kind = IsScopeStartLogical(line);
    line.kind = LineKind::kOther;
    EXPECT_EQ(IsScopeStartLogical(line), by_kind) << text;
    return by_kind;
  };
  EXPECT_TRUE(opens("def f():"));
  EXPECT_TRUE(opens("class A:"));
  EXPECT_TRUE(opens("async def f():"));
  EXPECT_FALSE(opens("type X = int"));
  EXPECT_FALSE(opens("async with x:"));
  EXPECT_FALSE(opens("x = 1"));
}

// ---- places in a source ----

TEST(SourceTexts, FindPlacesFromAnyLineInFront) {
  std::string text;
  for (int i = 0; i < 1000; ++i) text += std::string(static_cast<size_t>(i % 7), 'x') + "\n";
  const Cut cut(text);
  for (int32_t line = 0; line < 1000; ++line) {
    const char* at = cut.source->begin() + cut.source->line_starts[static_cast<size_t>(line)];
    for (const int32_t from : {0, line / 2, line}) EXPECT_EQ(cut.source->PositionFrom(from, at), (Position{line, 0}));
    EXPECT_EQ(cut.source->PositionOf(at + line % 7), (Position{line, line % 7}));
  }
}

TEST(SourceTexts, OfExpressionsKeepTheOuterOneAndItsPlaces) {
  Ref<SourceText> outer = SourceText::Copy("a\nbc");
  TokenizeOnly(*outer, Version::Of(3, 12));
  Ref<SourceText> inner = SourceText::Within(SourceText::Within(outer));
  const char* at = outer->begin() + 3;
  outer = {};
  EXPECT_EQ(inner->PositionOf(at), (Position{1, 1}));
  EXPECT_EQ(inner->text(), "a\nbc");
}

TEST(SourceTexts, TakeFileAfterFile) {
  const Ref<SourceText> source = SourceText::Copy("a = 1\n");
  std::vector<LineRow> rows;
  CutLines(*source, Version::Of(3, 8), rows);
  source->Assign("b");
  EXPECT_TRUE(source->tokens.empty());
  rows.clear();
  CutLines(*source, Version::Of(3, 8), rows);
  EXPECT_EQ(VerifyLines(*source, rows), "");
  EXPECT_EQ(source->tokens.size(), 1u);
  EXPECT_EQ(source->PositionOf(source->tokens[0].text), (Position{0, 0}));
}

// ---- what is unusual in a row ----

std::vector<LineRow> RowsCutCompletely(Text bytes, Version version = Version::Of(3, 12)) {
  const Ref<SourceText> source = SourceText::Copy(bytes);
  std::vector<LineRow> rows;
  CutLinesCompletely(*source, version, rows);
  return rows;
}

uint8_t UnusualIn(Text statement, Version version = Version::Of(3, 12)) {
  const std::vector<LineRow> rows = RowsCutCompletely(statement, version);
  EXPECT_EQ(rows.size(), 1u) << statement;
  return rows[0].unusual;
}

TEST(Unusual, IsWhatOnlySomeVersionsTake) {
  for (const char* statement :
       {"a.b = c[1] + 0.5, 0x1F, 1e5, None", R"(f('x\n', "'\\x", r'\x', *a, **b))",
        R"(x = '\\N\x41' + """\u0041\\U""")", "x != y / z - 1 | w", "from a import (b, c,)", "import a.b as __name__",
        "debug = __debug", R"(x = [b'a\x4f', 'b'])", R"(x = f'{a}\n' F"")"})
    EXPECT_EQ(UnusualIn(statement), 0) << statement;
  for (const char* statement :
       {"x = 0777",         "x = 1L",          "x = 1if y else z", R"(x = '\xZ')",    R"(x = """\N{a}""")",
        R"(x = b'\x4')",    "x = b'a' 'b'",    "x = 'a' b'b'",     "x = b'\xc3\xa9'", "x = Rb'a'",
        R"(x = f'\xZ{a}')", "x = rf'{a}'",     "x <> y",           "f(a := b)",       "def f() -> x:",
        "a @= b",           "a |= b",          "x = (yield)",      "lambda: await x", "nonlocal x",
        "x = __debug__",    "from a import *", "from a import b,"})
    EXPECT_EQ(UnusualIn(statement) & UnusualTokens::kOther, UnusualTokens::kOther) << statement;
  EXPECT_EQ(UnusualIn("if a: return b"), UnusualTokens::kReturn);
  EXPECT_EQ(UnusualIn("x = yield"), UnusualTokens::kYield);
  EXPECT_EQ(UnusualIn("yield from (a, x)"), UnusualTokens::kYield);
  for (const char* statement : {"await x", "async def f():", "async with a:", "x = [a async for a in b]"})
    EXPECT_EQ(UnusualIn(statement), UnusualTokens::kAwait) << statement;
}

TEST(Unusual, DependsOnTheVersion) {
  const Version python2 = Version::Of(2, 7);
  for (const char* statement : {"def f(a, /, b):", "f(a / b)"}) {
    EXPECT_NE(UnusualIn(statement, Version::Of(3, 7)), 0) << statement;
    EXPECT_EQ(UnusualIn(statement, Version::Of(3, 8)), 0) << statement;
    EXPECT_EQ(UnusualIn(statement, python2), 0) << statement;
  }
  for (const char* statement : {"None.x", "f(*a, b)", "x = 1_0"})
    EXPECT_NE(UnusualIn(statement, python2), 0) << statement;
  EXPECT_EQ(UnusualIn("x <> y", python2), 0);
  EXPECT_NE(UnusualIn("x = f'a'", python2), 0);
  // What waits is looked at wherever it stands.
  for (const Version version : {python2, Version::Of(3, 10), Version::Of(3, 14)}) {
    for (const char* statement : {"await x", "async with x:"})
      EXPECT_EQ(UnusualIn(statement, version) & UnusualTokens::kOther, UnusualTokens::kOther) << statement;
  }
  EXPECT_NE(UnusualIn("x", Version::Of(3, 5)), 0);
}

TEST(Unusual, IsAPlaceThatIsNotToldByTheColumn) {
  const auto is_odd = [](Text bytes, size_t row = 0) {
    return (RowsCutCompletely(bytes)[row].unusual & UnusualTokens::kPlace) != 0;
  };
  EXPECT_FALSE(is_odd("  x\n"));
  EXPECT_FALSE(is_odd("x; y\n"));
  EXPECT_FALSE(is_odd("\tx\ny\n", 1));
  EXPECT_TRUE(is_odd("x; y\n", 1));
  EXPECT_TRUE(is_odd("\tx\n"));
  EXPECT_TRUE(is_odd("\fx\n"));
  EXPECT_TRUE(is_odd("def f(): x\n"));
  EXPECT_TRUE(is_odd("def f(): x\n", 1));
  EXPECT_FALSE(is_odd("async with x:\n"));
}

// "+" for each row that goes on, "." for the others.
std::string GoingOn(Text bytes) {
  std::string found;
  for (const LineRow& row : RowsCutCompletely(bytes)) found += (row.unusual & UnusualTokens::kGoesOn) != 0 ? '+' : '.';
  return found;
}

TEST(GoesOn, APlainStatementBehindAnotherOneOfItsBlock) {
  EXPECT_EQ(GoingOn("a\nb = 1\n\n# c\nreturn d\n"), ".++++");
  EXPECT_EQ(GoingOn("if a:\n  b\n  c\n  (d)\ne\nf\n"), "..++.+");
  EXPECT_EQ(GoingOn("a\n  b\n  c\na\n"), "..+.");
  EXPECT_EQ(GoingOn("a\n\nif b:\n  # c\n  d\n"), ".+.+.");
  // What has a tab in front of it, or something else, is looked at.
  EXPECT_EQ(GoingOn("if a:\n\tb\n\tc\n"), "...");
  EXPECT_EQ(GoingOn("a; b\nc\nd\n"), "...+");
  // Two levels that are 2^24 and more apart are still two.
  EXPECT_EQ(GoingOn("a\n" + std::string(size_t{1} << 24, ' ') + "b\n"), "..");
}

TEST(GoesOn, NothingThatMayMeanSomethingElseInItsPlace) {
  for (const std::string statement :
       {"import b",   "from b import c", "@b",       "global b",  "nonlocal b", "break",
        "continue",   "match = 1",       "case = 1", "async = 1", "if b: c",    "class b: c",
        "def b(): c", "else:",           "\\\n",     "while b:",  "with b:",    "for b in c:",
        "try:",       "finally:",        "except:",  "elif b:",   "match b:",   "async def b():"}) {
    const std::string found = GoingOn("a\n" + statement + "\nd\n");
    EXPECT_EQ(found, std::string(found.size(), '.')) << statement;
  }
}

TEST(Unusual, IsNotAskedOfAnExactCut) {
  for (const LineRow& row : Cut("x = yield <> 0777\nx\nx\n\n# x\n").rows) EXPECT_EQ(row.unusual, 0);
}

// ---- what the fuzzer started from ----

TEST(Corpus, HoldsTheInvariantsInEveryVersion) {
  size_t files = 0;
  for (const auto& entry : std::filesystem::directory_iterator(QUILLET_SOURCE_DIR "/fuzz/corpus/lines")) {
    std::ifstream file(entry.path(), std::ios::binary);
    const std::string bytes((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
    for (const Version version : {Version::Of(2, 7), Version::Of(3, 8), Version::Of(3, 12)}) {
      const Ref<SourceText> source = SourceText::Copy(bytes);
      TokenizeOnly(*source, version);
      EXPECT_EQ(VerifyTokens(*source), "") << entry.path();
      EXPECT_FALSE(Cut(bytes, version).rows.empty()) << entry.path();
    }
    ++files;
  }
  EXPECT_GT(files, 0u);
}

}  // namespace
}  // namespace quillet
