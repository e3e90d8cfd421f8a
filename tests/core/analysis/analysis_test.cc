// The flow of one line: what each kind of failure becomes, and the expressions embedded in strings
// and comments, with errors planted at every offset.
#include <gtest/gtest.h>

#include <functional>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include "analysis/analyzer.h"
#include "analysis/file_analyzer.h"
#include "foundations/stop.h"
#include "lines/cutter.h"
#include "lines/fstring_fields.h"
#include "lines/string_hints.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

using testing::Analyze;
using testing::AnalyzedLine;
using testing::AnalyzeLine;
using testing::AnalyzerFor;
using testing::ConsoleCapture;
using testing::CutSource;
using testing::kPy2;
using testing::kPy3;
using testing::ReadNames;
using testing::RecordStrings;
using testing::ReportedErrors;
using testing::ShowError;
using Names = std::vector<std::string>;

// ---- the flow ----

TEST(Flow, APlainStatementIsParsedAndWalked) {
  const AnalyzedLine line = Analyze("x = y");
  EXPECT_EQ(line.error, "");
  EXPECT_EQ(line.records, (Names{"x :s:", "x y", "y :g:"}));
}

TEST(Flow, ALineIsAnalysedOnce) {
  const CutSource source("x +\ny = z\n");
  const auto bad = source.Line(0);
  EXPECT_EQ(AnalyzeLine(*bad).error, "1:4 invalid syntax");
  EXPECT_TRUE(bad->parsed);
  EXPECT_EQ(AnalyzeLine(*bad).error, "");
  const auto good = source.Line(1);
  const Names records = AnalyzeLine(*good).records;
  EXPECT_EQ(AnalyzeLine(*good).records, records);
}

TEST(Flow, ARejectedLineHasNoRecords) {
  const AnalyzedLine line = Analyze("x = f(y) z");
  EXPECT_EQ(line.error, "1:10 invalid syntax");
  EXPECT_EQ(line.records, Names{});
}

TEST(Flow, AnErrorOfAWalkerIsReturnedAsItStands) {
  const AnalyzedLine line = Analyze("f(1, x for x in y)");
  EXPECT_EQ(line.error, "1:6 Generator expression must be parenthesized if not sole argument");
  EXPECT_EQ(line.records, Names{});
}

TEST(Flow, ACommentLineIsNotParsedButLookedInto) {
  EXPECT_EQ(Analyze("# x = (").error, "");
  EXPECT_EQ(Analyze("# type: (int) -> str", kPy3, false, true).records,
            (Names{"int :g:", ":A:0 :h:int", "str :g:", "return :h:str"}));
}

TEST(Flow, ALineWithoutTokensIsNotWalked) {
  const AnalyzedLine line = Analyze("\n");
  EXPECT_EQ(line.error, "");
  EXPECT_EQ(line.records, Names{});
  LogicalLine removed;
  const std::vector<Token> toks(3);
  removed.toks = toks;
  removed.token_count = 3;
  EXPECT_EQ(AnalyzeLine(removed).error, "");
}

TEST(Flow, AnErrorInAContinuationPointsAtItsOwnLine) {
  EXPECT_EQ(Analyze("x = (1,\n  2 3)").error, "2:5 invalid syntax");
}

// Hooks that fail in one operation, as those of a host may.
class FailingHooks : public LineHooks {
 public:
  std::function<void()> on_append = [] {};
  std::function<void()> on_clear = [] {};
  std::function<EmbeddedLines()> embedded = [] { return EmbeddedLines(); };

  int GetTokType(LogicalLine& line, int64_t index) override {
    return TypeOfCode(line.toks[static_cast<size_t>(index)].code);
  }
  void AppendTypeEquiv(LogicalLine& line, Text name, Text equiv) override {
    on_append();
    line.DirectAppend(line.texts().Copy(name), line.texts().Copy(equiv));
  }
  void AppendArgTypeEquiv(LogicalLine& line, Text name, Text info) override { line.DirectAppendArg(name, info); }
  void SetParsed(LogicalLine& line, bool parsed) override { line.parsed = parsed; }
  void ClearDerivedInfo(LogicalLine& line) override {
    on_clear();
    line.DirectClearDerivedInfo();
  }
  EmbeddedLines GetExpLogicals(LogicalLine&) override { return embedded(); }
  void CopyTypeEquivs(LogicalLine& from, LogicalLine& to) override {
    for (const Record& record : from.type_equivs()) to.AppendTypeEquiv(record.name(), record.info());
  }
  bool GetHostArgRecords(LogicalLine&, std::vector<std::pair<std::string, std::string>>&) override { return false; }
  bool GetHostTokTypes(LogicalLine&, std::vector<int32_t>&) override { return false; }
};

class FlowWithHooks : public ::testing::Test {
 protected:
  FlowWithHooks() : source_("x = y\n"), line_(source_.Line(0)) { line_->hooks = &hooks_; }

  const ConsoleCapture capture_;
  FailingHooks hooks_;
  CutSource source_;
  std::unique_ptr<LogicalLine> line_;
};

// The tokens cannot be told then, as a host's join would say.
TEST_F(FlowWithHooks, AFailureOfAWalkOverRemovedTokensIsReportedAsThat) {
  hooks_.on_append = [] { ThrowError(ErrorKind::kKeyError, "k"); };
  std::vector<Token> toks{line_->toks[0], Token{}};
  toks.insert(toks.end(), line_->toks.begin() + 1, line_->toks.end());
  line_->SetPositions({{0, 0}, {0, 1}, {0, 2}, {0, 4}});
  line_->toks = toks;
  line_->token_count = 4;
  EXPECT_EQ(AnalyzeLine(*line_).error, "");
  EXPECT_EQ(ReportedErrors(), Names{"TypeError('sequence item 1: expected str instance, NoneType found')"});
}

TEST_F(FlowWithHooks, AnyOtherFailureOfAWalkIsReportedWithTheLinesTokens) {
  hooks_.on_append = [] { ThrowError(ErrorKind::kKeyError, "k"); };
  EXPECT_EQ(AnalyzeLine(*line_).error, "");
  EXPECT_EQ(RecordStrings(*line_), Names{});
  ASSERT_EQ(ReportedErrors().size(), 1u);
  EXPECT_EQ(ReportedErrors()[0],
            "ValueError(\"Could not analyze logical -- inner exception is KeyError('k')\\n  logical tokens: x = y\")");
}

TEST_F(FlowWithHooks, AParseErrorOfAHookIsAnInternalFailureOfItsWalk) {
  hooks_.on_append = [] { throw ParseError("p", -1, kNoText, Context::Index(0)); };
  EXPECT_EQ(AnalyzeLine(*line_).error, "");
  EXPECT_EQ(ReportedErrors().size(), 1u);
}

TEST_F(FlowWithHooks, ASyntaxErrorOfAHookIsReturned) {
  hooks_.on_append = [] { throw SyntaxError("mine", "file", 7, 8, "text"); };
  EXPECT_EQ(AnalyzeLine(*line_).error, "7:8 mine");
  EXPECT_EQ(ReportedErrors(), Names{});
}

TEST_F(FlowWithHooks, AnExceptionOfTheHostsIsWrappedWhereTheHostDescribesIt) {
  hooks_.on_append = [] { throw std::runtime_error("host"); };
  TheConsole().describe_exception = [](const std::exception_ptr&) { return std::string("HostError()"); };
  EXPECT_EQ(AnalyzeLine(*line_).error, "");
  ASSERT_EQ(ReportedErrors().size(), 1u);
  EXPECT_NE(ReportedErrors()[0].find("inner exception is HostError()"), std::string::npos);
}

TEST_F(FlowWithHooks, AnExceptionOfTheHostsThatIsNotDescribedIsReportedAsItIs) {
  hooks_.on_append = [] { throw std::runtime_error("host"); };
  TheConsole().describe_exception = [](const std::exception_ptr&) { return std::string(); };
  TheConsole().report_exception = [](const std::exception_ptr& exception, bool suppress_gui) {
    EXPECT_TRUE(suppress_gui);
    try {
      std::rethrow_exception(exception);
    } catch (const std::runtime_error& error) {
      ReportedErrors().push_back(error.what());
    }
  };
  EXPECT_EQ(AnalyzeLine(*line_).error, "");
  EXPECT_EQ(ReportedErrors(), Names{"host"});
}

TEST_F(FlowWithHooks, AFailureWhileAFailureIsHandledIsRaised) {
  hooks_.on_append = [] { ThrowError(ErrorKind::kKeyError, "k"); };
  int clears = 0;
  hooks_.on_clear = [&clears] {
    if (++clears == 2) ThrowError(ErrorKind::kRuntimeError, "cannot clear");
  };
  EXPECT_THROW(AnalyzeLine(*line_), Error);
}

TEST_F(FlowWithHooks, TreesGoBackOnEveryWayOut) {
  const NodePool& pool = AnalyzerFor(kPy3).logical_parser().factory().pool();
  hooks_.on_append = [] { ThrowError(ErrorKind::kKeyError, "k"); };
  AnalyzeLine(*line_);
  const size_t count = pool.node_count();
  for (int i = 0; i < 100; ++i) {
    line_->parsed = false;
    AnalyzeLine(*line_);
  }
  EXPECT_EQ(pool.node_count(), count);
}

TEST_F(FlowWithHooks, EmbeddedLinesGoOneLevelDeepAndGiveTheirRecordsUp) {
  const CutSource inner("f'{a}'\n");
  const auto exp = inner.Line(0);
  exp->kind = LineKind::kFstringFieldExp;
  hooks_.embedded = [&] {
    EmbeddedLines embedded;
    embedded.lines.push_back(exp.get());
    return embedded;
  };
  EXPECT_EQ(ReadNames(AnalyzeLine(*line_)), Names{"y"});
  const CutSource other("b\n");
  const auto name = other.Line(0);
  hooks_.embedded = [&] {
    EmbeddedLines embedded;
    embedded.lines.push_back(name.get());
    return embedded;
  };
  line_->parsed = false;
  EXPECT_EQ(ReadNames(AnalyzeLine(*line_)), (Names{"y", "b"}));
}

TEST_F(FlowWithHooks, ACommentedHintIsPassedOver) {
  const CutSource inner("a b\n");
  const auto exp = inner.Line(0);
  exp->kind = LineKind::kCommentedTypeHint;
  hooks_.embedded = [&] {
    EmbeddedLines embedded;
    embedded.lines.push_back(exp.get());
    return embedded;
  };
  EXPECT_EQ(AnalyzeLine(*line_).error, "");
}

TEST_F(FlowWithHooks, AnErrorInAnEmbeddedLineCountsFromTheOuterLinesFirstLine) {
  // A statement that begins on line 10, and a hint on its third physical line.
  line_->first_line = 10;
  const std::vector<Position> places{{0, 0}, {0, 2}, {0, 4}};
  line_->SetPositions(places);
  const CutSource inner("   a b\n");
  const auto exp = inner.Line(0);
  exp->kind = LineKind::kStringifiedTypeHint;
  const Position stored[] = {{0, 3}, {0, 5}};
  exp->SetPositions({stored, stored + 2});
  exp->first_line = 12;
  hooks_.embedded = [&] {
    EmbeddedLines embedded;
    embedded.lines.push_back(exp.get());
    return embedded;
  };
  const auto error = AnalyzerFor(kPy3).AnalyzeSingleLogical(*line_, false);
  ASSERT_TRUE(error);
  EXPECT_EQ(ShowError(*error), "3:6 invalid syntax in stringified type hint");
  // The message stands in the place of the file name, and the text is the embedded line's.
  EXPECT_EQ(error->filename, "invalid syntax in stringified type hint");
  EXPECT_EQ(error->text, "   a b");
  EXPECT_EQ(RecordStrings(*line_), Names{});
}

// ---- embedded expressions: which there are ----

std::string ShowTokens(TokenSpan toks) {
  std::string shown;
  for (const Token& token : toks) {
    if (!shown.empty()) shown += ' ';
    if (token.code == tok::ERRORTOKEN) shown += '?';
    shown += token.view();
  }
  return shown;
}

Names EmbeddedIn(Text text, Version version = kPy3) {
  const CutSource source(text, version);
  const auto line = source.Line(0);
  Names shown;
  for (const LogicalLine* exp : line->GetExpLogicals().lines) {
    const char* kind = exp->kind == LineKind::kFstringFieldExp       ? ""
                       : exp->kind == LineKind::kStringifiedTypeHint ? "hint "
                                                                     : "comment ";
    shown.push_back(kind + ShowTokens(exp->toks));
    EXPECT_EQ(exp->token_count, static_cast<int32_t>(exp->toks.size()));
  }
  return shown;
}

struct EmbeddedCase {
  const char* source;
  Names embedded;
};

void ExpectEmbedded(const std::vector<EmbeddedCase>& cases, Version version = kPy3) {
  for (const EmbeddedCase& c : cases) EXPECT_EQ(EmbeddedIn(c.source, version), c.embedded) << c.source;
}

TEST(Fields, AreTheExpressionsInBraces) {
  ExpectEmbedded({
      {"f'{x}'", {"x"}},
      {"f'a{x}b{y}c'", {"x", "y"}},
      {"F\"{x}\"", {"x"}},
      {"f'''{x}\n{y}'''", {"x", "y"}},
      {"f\"\"\"{x\n+ y}\"\"\"", {"x + y"}},
      {"rf'{x}'", {"x"}},
      {"Rf'{x}' fr'{y}'", {"x", "y"}},
      {"f''", {}},
      {"f'plain'", {}},
      {"'{x}'", {}},
      {"b'{x}'", {}},
      {"f'{x}' '{y}' f'{z}'", {"x", "z"}},
      {"f'{a, b}'", {"a , b"}},
      {"f'{*a}'", {"* a"}},
      {"f'{yield x}'", {"yield x"}},
      {"f'{(lambda x: 1)}'", {"( lambda x : 1 )"}},
      {"f'{ {1: 2}[1] }'", {"{ 1 : 2 } [ 1 ]"}},
      {"f'{d[\"k\"]}'", {"d [ \"k\" ]"}},
      {"f'{x[1:2]}'", {"x [ 1 : 2 ]"}},
      {"f'{(x:=1)}'", {"( x := 1 )"}},
      {"f'{a if b else c}'", {"a if b else c"}},
      {"f'{1.5e3} {0xff} {a.b}'", {"1.5e3", "0xff", "a . b"}},
      {"f'{\xC3\xA4}'", {"\xC3\xA4"}},
  });
}

TEST(Fields, DoubledBracesAndEscapesAreLiteral) {
  ExpectEmbedded({
      {"f'{{x}}'", {}},
      {"f'{{{x}}}'", {"x"}},
      {"f'{{}}{x}'", {"x"}},
      {"f'\\N{BULLET}{x}'", {"x"}},
      {"f'\\{x}'", {"x"}},
      {"f'\\\\{x}'", {"x"}},
      {"f'\\'{x}'", {"x"}},
      {"rf'\\{x}'", {"x"}},
      {"rf'\\N{x}'", {"x"}},
      {"f'\\x41{x}\\\n{y}'", {"x", "y"}},
  });
}

TEST(Fields, ConversionsAndFormatsAreNoPartOfTheExpression) {
  ExpectEmbedded({
      {"f'{x!r}'", {"x"}},
      {"f'{x!r:>10}'", {"x"}},
      {"f'{x:>10}'", {"x"}},
      {"f'{x:}'", {"x"}},
      {"f'{x:=^5}'", {"x"}},
      {"f'{x!r:>{w}}'", {"x", "w"}},
      {"f'{x:{w}.{p}}'", {"x", "w", "p"}},
      {"f'{x:{w:{v}}}{y}'", {"x", "w", "v", "y"}},
      {"f'{x:a{{y}}}'", {"x", "{ y }"}},  // in a format a brace is never literal
      {"f'{x=}'", {"x"}},
      {"f'{x = }'", {"x"}},
      {"f'{x=!r:>5}'", {"x"}},
      {"f'{x==y}'", {"x == y"}},
      {"f'{x!=y}'", {"x != y"}},
      {"f'{x<=y}{x>=y}'", {"x <= y", "x >= y"}},
      {"f'{x:%H:%M}'", {"x"}},
      {"f'{x!s }'", {"x"}},
  });
}

TEST(Fields, OfNestedStringsFollowThoseOfTheOuterOne) {
  ExpectEmbedded({
      {"f'{f\"{x}\"}'", {"f\"{x}\"", "x"}},
      {"f'{x}{f\"{y}{z}\"}{w}'", {"x", "f\"{y}{z}\"", "w", "y", "z"}},
      {"f'{\"{no}\"}'", {"\"{no}\""}},
      {"f'{f'{f'{x}'}'}'", {"f'{f'{x}'}'", "f'{x}'", "x"}},
      {"f'{x:{f\"{y}\"}}'", {"x", "f\"{y}\"", "y"}},
      {"f'{d['k']}'", {"d [ 'k' ]"}},
  });
  ExpectEmbedded({{"f'{f\"{x}\"}'", {"f\"{x}\"", "x"}}, {"f'''{f'{x}'}'''", {"f'{x}'", "x"}}}, Version::Of(3, 8));
}

TEST(Fields, CommentsInThemEndWithTheirLine) {
  ExpectEmbedded({{"f'''{x # }\n}'''", {"x # }"}}, {"f'''{x = # }\n!r # }\n}'''", {"x"}}});
}

TEST(Fields, WhatTheLanguageDoesNotHaveHoldsAnErrorToken) {
  ExpectEmbedded(
      {
          {"f'{}'", {"?}"}},        {"f'{ }'", {"?}"}},         {"f'{!r}'", {"?!"}},      {"f'{:x}'", {"?:"}},
          {"f'}'", {"?}"}},         {"f'a}b'", {"?}"}},         {"f'{x'", {"x ?'"}},      {"f'{x!'", {"x ?! ?'"}},
          {"f'{x:'", {"x", "?'"}},  {"f'{x!z}'", {"x ?!"}},     {"f'{x!rr}'", {"x ?!"}},  {"f'{x!r y}'", {"x ?y"}},
          {"f'{x=y}'", {"x ?= y"}}, {"f'{x+=1}'", {"x ?+= 1"}}, {"f'{x;y}'", {"x ?; y"}}, {"f'{del x}'", {"?del x"}},
          {"f'{@x}'", {"?@ x"}},    {"f'{if x}'", {"?if x"}},   {"f'{#}'", {"#} ?'"}},
      },
      Version::Of(3, 8));
}

TEST(Fields, UnterminatedStringsHaveNone) {
  EXPECT_EQ(EmbeddedIn("x = f'{y}"), Names{});
  EXPECT_EQ(Analyze("x = f'{y}").error, "1:5 invalid syntax");
}

TEST(Fields, AreReadByTheStatement) {
  EXPECT_EQ(ReadNames(Analyze("x = f'{a.b} {c!r:>{w}} {f(d)=}'")), (Names{"a", "a.b", "c", "w", "f", "d"}));
  EXPECT_EQ(ReadNames(Analyze("f'{f\"{x}\"}'")), Names{"x"});
  EXPECT_EQ(Analyze("f'{lambda x: 1}'").error, "1:12 invalid syntax");
  EXPECT_EQ(Analyze("f'{await x}'").error, "");
}

TEST(Fields, EmptyAndBrokenOnesAreRejectedInTheirPlace) {
  EXPECT_EQ(Analyze("x = f'ab{}'").error, "1:10 invalid syntax");
  EXPECT_EQ(Analyze("x = f'ab}'").error, "1:9 invalid syntax");
  EXPECT_EQ(Analyze("x = f'{a b}'").error, "1:10 invalid syntax");
  EXPECT_EQ(Analyze("x = f'{a'").error, "1:9 invalid syntax");
  EXPECT_EQ(Analyze("x = f'''{\na\nb}'''").error, "3:1 invalid syntax");
}

TEST(Fields, AnErrorAtEveryOffsetLandsOnItsLineAndColumn) {
  const std::string quotes[] = {"'", "\"", "'''", "\"\"\""};
  for (const std::string& quote : quotes) {
    for (const char* prefix : {"f", "rF", "F"}) {
      const bool triple = quote.size() == 3;
      const std::string front = std::string("name = call(1,\n  ") + prefix + quote + (triple ? "text\n  {" : "text {");
      const std::string field = triple ? "alpha +\n beta[1:2] (gamma)" : "alpha + beta[1:2] (gamma)";
      for (size_t at = 0; at <= field.size(); ++at) {
        std::string broken = field;
        broken.insert(at, " $ ");
        const std::string source = front + broken + ":>{width}}" + quote + ")";
        const size_t place = source.find('$');
        const auto lines = std::count(source.begin(), source.begin() + static_cast<ptrdiff_t>(place), '\n');
        const size_t line_start = source.rfind('\n', place) + 1;
        const std::string expected = std::to_string(lines + 1) + ":" + std::to_string(place - line_start + 1);
        EXPECT_EQ(Analyze(source).error, expected + " invalid syntax") << source;
      }
    }
  }
}

// ---- hints in strings ----

TEST(StringHints, StandInAnnotations) {
  ExpectEmbedded({
      {"x: 'T' = 1", {"hint T"}},
      {"x: 'T'", {"hint T"}},
      {"self.x: \"List[T]\" = y", {"hint List [ T ]"}},
      {"x: List['T']", {"hint T"}},
      {"x: Dict['K', List['V']]", {"hint K", "hint V"}},
      {"x: Callable[['A'], 'B']", {"hint A", "hint B"}},
      {"x: ('T')", {"hint T"}},
      {"x: 'T' | None", {"hint T"}},
      {"x: r'T'", {"hint T"}},
      {"x: u'T'", {"hint T"}},
      {"x: '''T'''", {"hint T"}},
      {"x: ''", {}},
      {"def f(a: 'A', *b: 'B', c: 'C' = 'no', **d: 'D') -> 'R': pass",
       {"hint A", "hint B", "hint C", "hint D", "hint R"}},
      {"async def f(a: 'A') -> List['R']:", {"hint A", "hint R"}},
      {"def f[T: 'no'](a: 'A'): pass", {"hint A"}},
      {"def f(a='no', b: 'B' = 'no'): pass", {"hint B"}},
      {"def f(a=lambda x, y: 'no', b: 'B' = 1): pass", {"hint B"}},
      {"def f(a: 'A',  # c\n  b: 'B'): pass", {"hint A", "hint B"}},
      {"if y: x: 'T' = 1", {"hint T"}},
  });
}

TEST(StringHints, OtherStringsAreValues) {
  ExpectEmbedded({
      {"x = 'no'", {}},
      {"x: int = 'no'", {}},
      {"x = {'a': 'no'}", {}},
      {"x[1:'no']", {}},
      {"if x == 'no': pass", {}},
      {"lambda x: 'no'", {}},
      {"else: 'no'", {}},
      {"x: Literal['no']", {}},
      {"x: typing.Literal['no', 'no']", {}},
      {"x: Annotated['T', 'no']", {"hint T"}},
      {"x: Field('no')", {}},
      {"x: List['T', Field('no'), Literal['no']]", {"hint T"}},
      {"x: 'a' 'b'", {}},
      {"x: 'a' + 'b'", {}},
      {"x: 'a'.b", {}},
      {"x: y['a'] == 'no'", {"hint a"}},
      {"x: b'no'", {}},
      {"x: 'a\\nb'", {}},
      {"return 'no'", {}},
      {"class C(A['no']): pass", {}},
      {"match x: 'no'", {}},
      {"case {'k': 'no'}:", {}},
  });
}

TEST(StringHints, AreTheFirstArgumentOfCast) {
  ExpectEmbedded({
      {"x = cast('T', y)", {"hint T"}},
      {"x = typing.cast('List[T]', y)", {"hint List [ T ]"}},
      {"x = cast(List['T'], 'no')", {"hint T"}},
      {"f(cast('A', cast('B', y)))", {"hint A", "hint B"}},
      {"x = other.cast('no', y)", {}},
      {"def cast(a='no'): pass", {}},
      {"x = cast(f('no'), y)", {}},
      {"x = cast", {}},
  });
}

TEST(StringHints, AreReadByTheStatement) {
  EXPECT_EQ(ReadNames(Analyze("x: 'List[T]' = y")), (Names{"y", "List", "T"}));
  EXPECT_EQ(ReadNames(Analyze("def f(a: 'A') -> 'B': pass")), (Names{"A", "B"}));
}

TEST(StringHints, AnErrorAtEveryOffsetLandsOnItsLineAndColumn) {
  const std::string hint = "Dict[K, List[V]]";
  const std::string fronts[] = {"x: '", "def f(a,\n      b: '", "x: Tuple[\n  '", "y = cast(\n'"};
  const std::string backs[] = {"' = 1", "'): pass", "']", "', z)"};
  for (size_t form = 0; form < std::size(fronts); ++form) {
    for (size_t at = 0; at <= hint.size(); ++at) {
      std::string broken = hint;
      broken.insert(at, " $ ");
      const std::string source = fronts[form] + broken + backs[form];
      const size_t place = source.find('$');
      const auto lines = std::count(source.begin(), source.begin() + static_cast<ptrdiff_t>(place), '\n');
      const size_t line_start = source.rfind('\n', place) + 1;
      const std::string expected = std::to_string(lines + 1) + ":" + std::to_string(place - line_start + 1);
      EXPECT_EQ(Analyze(source).error, expected + " invalid syntax in stringified type hint") << source;
    }
  }
}

TEST(StringHints, AreExpressions) {
  EXPECT_EQ(Analyze("x: 'a = 1'").error, "1:7 invalid syntax in stringified type hint");
  EXPECT_EQ(Analyze("x: 'import a'").error, "1:5 invalid syntax in stringified type hint");
  EXPECT_EQ(Analyze("x: 'a: b'").error, "1:6 invalid syntax in stringified type hint");
  EXPECT_EQ(Analyze("x: 'a; b'").error, "1:6 invalid syntax in stringified type hint");
  EXPECT_EQ(Analyze("x: 'lambda a=1: b'").error, "");
}

TEST(CommentedHints, AreLinesThatTheAnalysisPassesOver) {
  ExpectEmbedded({
      {"x = 1  # type: List[int]  # c", {"comment List [ int ]"}},
      {"x = 1  # type: ignore", {}},
      {"x = 1  # type:", {}},
      {"# type: (int) -> str", {"comment ( int ) -> str"}},
  });
}

// ---- positions ----

TEST(EmbeddedPositions, AreThoseOfThePhysicalLine) {
  const CutSource source("\n\nx = g(1,\n  f'''a\n  {b}\n''')\n");
  const auto line = source.Line(2);
  const EmbeddedLines embedded = line->GetExpLogicals();
  ASSERT_EQ(embedded.lines.size(), 1u);
  const LogicalLine& exp = *embedded.lines[0];
  EXPECT_EQ(line->first_line, 2);
  EXPECT_EQ(exp.first_line, 4);
  EXPECT_EQ(exp.positions()[0], (Position{0, 3}));
}

// Tokens whose positions the host gave, whatever they are in the bytes.
TEST(EmbeddedPositions, CountFromTheTokensOwnWhereTheHostGaveIt) {
  const CutSource source("f'''a\n {b}\r\n{c}{\nd +\r e}'''\n");
  const auto line = source.Line(0);
  line->first_line = 100;
  line->SetPositions({{3, 7}});
  const EmbeddedLines embedded = line->GetExpLogicals();
  ASSERT_EQ(embedded.lines.size(), 3u);
  EXPECT_EQ(embedded.lines[0]->first_line, 104);
  EXPECT_EQ(embedded.lines[0]->positions()[0], (Position{0, 2}));
  EXPECT_EQ(embedded.lines[1]->first_line, 105);
  EXPECT_EQ(embedded.lines[1]->positions()[0], (Position{0, 1}));
  EXPECT_EQ(embedded.lines[2]->first_line, 106);
  EXPECT_EQ(embedded.lines[2]->positions()[1], (Position{0, 2}));
  EXPECT_EQ(embedded.lines[2]->positions()[2], (Position{1, 1}));
  const CutSource one("f'{b}'\n");
  const auto flat = one.Line(0);
  flat->SetPositions({{0, 7}});
  EXPECT_EQ(flat->GetExpLogicals().lines[0]->positions()[0], (Position{0, 10}));
}

TEST(EmbeddedPositions, BothWaysAgree) {
  const Text text = "x = h(f'{a b}',\n f'''{\n c}{d}''', cast(\n'E', 1))\n";
  const CutSource source(text);
  const auto by_source = source.Line(0);
  const auto by_host = source.Line(0);
  std::vector<Position> positions;
  for (size_t i = 0; i < by_source->positions().size(); ++i) positions.push_back(by_source->positions()[i]);
  by_host->SetPositions(positions);
  const EmbeddedLines left = by_source->GetExpLogicals();
  const EmbeddedLines right = by_host->GetExpLogicals();
  ASSERT_EQ(left.lines.size(), 4u);
  ASSERT_EQ(right.lines.size(), 4u);
  for (size_t i = 0; i < left.lines.size(); ++i) {
    EXPECT_EQ(left.lines[i]->first_line, right.lines[i]->first_line);
    ASSERT_EQ(left.lines[i]->toks.size(), right.lines[i]->toks.size());
    for (size_t t = 0; t < left.lines[i]->toks.size(); ++t)
      EXPECT_EQ(left.lines[i]->positions()[t], right.lines[i]->positions()[t]);
  }
}

TEST(EmbeddedLines, OutliveTheLineTheyCameFrom) {
  EmbeddedLines embedded;
  {
    const CutSource source("f'{abc}'\n");
    embedded = source.Line(0)->GetExpLogicals();
  }
  EXPECT_EQ(ShowTokens(embedded.lines[0]->toks), "abc");
}

// ---- size and bad input ----

std::string Repeat(const std::string& text, int count) {
  std::string repeated;
  for (int i = 0; i < count; ++i) repeated += text;
  return repeated;
}

TEST(EmbeddedSize, ManyFieldsAndHintsTakeLinearTime) {
  EXPECT_EQ(EmbeddedIn("f'" + Repeat("{a!r:>{b}} ", 50000) + "'").size(), 100000u);
  EXPECT_EQ(EmbeddedIn("x: T[" + Repeat("'A', ", 100000) + "]").size(), 100000u);
  EXPECT_EQ(EmbeddedIn("x = " + Repeat("cast('A', ", 50000) + "y" + Repeat(")", 50000)).size(), 50000u);
  EXPECT_EQ(EmbeddedIn("x = " + Repeat("cast('A', ", 50000)).size(), 50000u);
  EXPECT_EQ(EmbeddedIn("f'" + Repeat("}", 100001) + "'").size(), 1u);
  EXPECT_EQ(EmbeddedIn("f'" + Repeat("{", 100001) + "'").size(), 1u);
  EmbeddedIn("f'" + Repeat("{x:", 100000) + "'");
  EmbeddedIn("x = " + Repeat("f'{", 20000) + "x" + Repeat("}'", 20000));
  EmbeddedIn("def f(" + Repeat("a: (", 100000));
  EmbeddedIn("x: " + Repeat("lambda: ", 100000) + "'T'");
}

TEST(EmbeddedBadInput, AnyContentsGiveLinesWithinTheString) {
  std::mt19937 random(3);
  const std::string alphabet = "{}{}{}!:=\\'\"#()[]fxr\n N+.1@;\xC3\xA4";
  for (int round = 0; round < 100000; ++round) {
    std::string text = random() % 2 == 0 ? "f'''" : "x: f'";
    const int length = static_cast<int>(random() % 16);
    for (int i = 0; i < length; ++i) text += alphabet[random() % alphabet.size()];
    text += text[0] == 'f' ? "'''" : "'";
    const CutSource source(text, random() % 2 == 0 ? kPy3 : Version::Of(3, 8));
    for (size_t i = 0; i < source.size(); ++i) {
      const auto line = source.Line(i);
      for (const LogicalLine* exp : line->GetExpLogicals().lines) {
        ASSERT_FALSE(exp->toks.empty()) << text;
        ASSERT_GE(exp->toks.front().text, line->source->begin()) << text;
        const char* end = line->source->begin();
        for (const Token& token : exp->toks) {
          ASSERT_GE(token.text, end) << text;
          end = token.end();
        }
        ASSERT_LE(end, line->source->end()) << text;
      }
    }
  }
}

TEST(AnalysisBadInput, MutatedStatementsGivePositionedErrorsOrResults) {
  std::mt19937 random(5);
  const ConsoleCapture capture;
  const char* const pieces[] = {"def ", "class ",  "type ", "with ",  "except ", "match ", "case ",  "f",
                                "x",    "(",       ")",     "[",      "]",       "{",      "}",      ":",
                                ",",    "*",       "**",    "=",      "->",      "@",      "as ",    "if ",
                                "else", "1",       "'s'",   "f'{x}'", "|",       "async ", "await ", "# type: int\n",
                                "\\\n", "lambda ", "...",   "."};
  int accepted = 0;
  for (int round = 0; round < 50000; ++round) {
    std::string text;
    const int length = 1 + static_cast<int>(random() % 12);
    for (int i = 0; i < length; ++i) text += pieces[random() % std::size(pieces)];
    const Version version = random() % 3 == 0 ? kPy2 : kPy3;
    const CutSource source(text, version);
    for (size_t i = 0; i < source.size(); ++i) {
      const auto line = source.Line(i);
      const auto error = AnalyzerFor(version).AnalyzeSingleLogical(*line, random() % 2 == 0, random() % 2 == 0);
      accepted += !error;
      if (error) {
        EXPECT_GE(error->lineno, 1) << text;
        EXPECT_TRUE(line->type_equivs().empty()) << text;
      }
    }
  }
  EXPECT_GT(accepted, 1000);
}

// ---- work that is stopped ----

// How often a question is asked while `work` runs. It is stopped when it was asked `limit` times.
template <class Work>
size_t QuestionsOf(size_t limit, Work&& work) {
  size_t asked = 0;
  const ThreadStopQuestion question([&asked, limit] {
    if (++asked == limit) throw Stopped();
  });
  try {
    work();
  } catch (const Stopped&) {
    EXPECT_EQ(asked, limit);
  }
  return asked;
}

std::string Repeated(Text text, size_t times) {
  std::string all;
  for (size_t i = 0; i < times; ++i) all += text;
  return all;
}

TEST(Stop, WorkEndsWhereItIsNotWantedAndTheNextOneIsWhole) {
  const std::vector<std::string> sources = {
      "x = [" + Repeated("name, ", 100'000) + "]\n",                      // one statement
      Repeated("name = call(value)\n", 20'000),                           // many
      "x = f'" + Repeated("{name}", 30'000) + "'\n",                      // expressions within one
      "def f(" + Repeated("a: 'List[int]', ", 10'000) + "b): pass\n",     // hints
      "match x, y:\n  case [" + Repeated("[a, b], ", 30'000) + "]: x\n",  // parsed by hand
      "type X[" + Repeated("T: (int, str), ", 10'000) + "S] = int\n",
      "with (" + Repeated("a as b, ", 40'000) + "c): pass\n",
  };
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = testing::AnalyzerOptions(kPy3);
  FileAnalyzer files(options);
  FileAnalyzer untouched(options);
  const ConsoleCapture of_walks_that_meet_their_limit;
  for (const std::string& source : sources) {
    size_t asked = 0;
    for (size_t limit = 1;; ++limit) {
      asked = QuestionsOf(limit, [&] { files.Analyze(source); });
      if (asked < limit) break;
    }
    EXPECT_GE(asked, 2u) << source.substr(0, 20);
    EXPECT_LE(asked, source.size() / 1000) << source.substr(0, 20);
    untouched.Analyze(source);
    EXPECT_EQ(files.store().rows.size(), untouched.store().rows.size());
    EXPECT_EQ(files.store().arg_rows.size(), untouched.store().arg_rows.size());
    EXPECT_EQ(files.errors().size(), untouched.errors().size());
    ASSERT_EQ(files.rows().size(), untouched.rows().size());
  }
}

TEST(Stop, ALineThatWasStoppedCanBeAnalysedAgain) {
  const std::string text = "x = [" + Repeated("name, ", 100'000) + "]\n";
  const Ref<SourceText> source = SourceText::Copy(text);
  std::vector<LineRow> rows;
  CutLines(*source, kPy3, rows);
  LogicalLine line;
  SetFromRow(line, source, rows.at(0));
  CPGenAnalyzerImpl& analyzer = AnalyzerFor(kPy3);
  const ConsoleCapture of_a_walk_that_meets_its_limit;
  EXPECT_EQ(QuestionsOf(1, [&] { analyzer.AnalyzeSingleLogical(line, false); }), 1u);
  EXPECT_FALSE(line.parsed);
  EXPECT_TRUE(line.type_equivs().empty());
  EXPECT_EQ(analyzer.AnalyzeSingleLogical(line, false), std::nullopt);
  EXPECT_FALSE(line.type_equivs().empty());
}

TEST(Stop, AllQuestionsOfAThreadAreAsked) {
  std::string asked;
  const ThreadStopQuestion outer([&asked] { asked += 'o'; });
  {
    const ThreadStopQuestion inner([&asked] { asked += 'i'; });
    AskWhetherToStop();
  }
  AskWhetherToStop();
  EXPECT_EQ(asked, "ioo");
}

TEST(Stop, AFewStepsAskNothing) {
  size_t asked = 0;
  const ThreadStopQuestion question([&asked] { ++asked; });
  AskWhetherToStop();
  CountSteps(kStepsBetweenQuestions / 2);
  EXPECT_EQ(asked, 1u);
  CountSteps(kStepsBetweenQuestions);
  EXPECT_EQ(asked, 2u);
}

}  // namespace
}  // namespace quillet
