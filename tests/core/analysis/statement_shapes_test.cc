// Statements that are told from others of their shape: the same records, at the same places, as where each is
// analysed. Statements here come in families, whose members have one shape but for what each test is about.
#include "analysis/statement_shapes.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

#include "foundations/stop.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/both_ways.h"

namespace quillet {
namespace {

using testing::AnalyzerOptions;
using testing::ConsoleCapture;

struct Reading {
  Version version;
  bool is_complete;
};

const std::vector<Reading>& Readings() {
  static const std::vector<Reading> readings = {
      {Version::Of(2, 7), false}, {Version::Of(3, 8), false}, {Version::Of(3, 12), false},
      {Version::Of(2, 7), true},  {Version::Of(3, 6), false}, {Version::Of(3, 4), true},
      {Version::Of(3, 6), true},  {Version::Of(3, 8), true},  {Version::Of(3, 13), true},
  };
  return readings;
}

FileAnalyzer::Options OptionsOf(const Reading& reading) {
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = AnalyzerOptions(reading.version);
  options.reads_completely = reading.is_complete;
  return options;
}

// All readings, with tables that live from source to source.
class Readers {
 public:
  Readers() {
    for (const Reading& reading : Readings()) both_.push_back(std::make_unique<BothWays>(OptionsOf(reading)));
  }

  void Expect(Text source) {
    for (size_t i = 0; i < both_.size(); ++i) {
      EXPECT_EQ(both_[i]->Compare(source), "")
          << Readings()[i].version.parts[0] << "." << Readings()[i].version.parts[1]
          << (Readings()[i].is_complete ? ", complete" : "");
    }
  }

 private:
  ConsoleCapture console_;
  std::vector<std::unique_ptr<BothWays>> both_;
};

std::string Joined(const std::vector<std::string>& statements) {
  std::string source;
  for (const std::string& statement : statements) source += statement + "\n";
  return source;
}

// ---- that shapes are told at all ----

class Shapes : public ::testing::Test {
 protected:
  // Whether the statement is told, after it has been met once more.
  bool IsTold(const std::string& statement) {
    const testing::CutSource source(statement);
    const auto line = source.Line(0);
    RecordStore store;
    line->WriteTo(&store);
    return shapes_.Tell(*line, {}, TypingNames());
  }

  CPGenAnalyzerImpl analyzer_{AnalyzerOptions(testing::kPy3)};
  StatementShapes shapes_{analyzer_, 3};
};

TEST_F(Shapes, AreToldOnceTheyAreFrequent) {
  EXPECT_FALSE(IsTold("self.a = f(b, 1)\n"));
  EXPECT_FALSE(IsTold("this.name = call(other, 22)\n"));
  EXPECT_TRUE(IsTold("x.y = z(v, 3)\n"));
  EXPECT_TRUE(IsTold("object.attribute = function(argument, 444)\n"));
}

TEST_F(Shapes, DifferInWhatIsEqualAndInHowTokensStand) {
  for (int i = 0; i < 3; ++i) IsTold("a = f(b)\n");
  EXPECT_TRUE(IsTold("c = g(d)\n"));
  EXPECT_FALSE(IsTold("c = g(c)\n"));
  EXPECT_FALSE(IsTold("c = g (d)\n"));
  EXPECT_FALSE(IsTold("c =  g(d)\n"));
  EXPECT_FALSE(IsTold("c = isinstance(d)\n"));
  EXPECT_FALSE(IsTold("c = g(1)\n"));
}

TEST_F(Shapes, WithExpressionsOfTheirOwnInATokenAreAnalysed) {
  for (int i = 0; i < 5; ++i) {
    EXPECT_FALSE(IsTold("x = f'{a}'\n"));
    EXPECT_FALSE(IsTold("x: 'A' = b\n"));
    EXPECT_FALSE(IsTold("x = []  # type: A\n"));
  }
}

TEST_F(Shapes, ThatFailAreAnalysed) {
  for (int i = 0; i < 5; ++i) {
    EXPECT_FALSE(IsTold("a b\n"));
    EXPECT_FALSE(IsTold("f(a for a in b, c)\n"));
    EXPECT_FALSE(IsTold("x = \\\n  a\n"));
  }
}

TEST(Told, NeverWhereAnAnalyzerHasWordsOfItsOwn) {
  CPGenAnalyzerImpl::Options options = AnalyzerOptions(testing::kPy3);
  options.keywords.emplace_back("unless");
  CPGenAnalyzerImpl analyzer(options);
  StatementShapes shapes(analyzer, 1);
  const testing::CutSource source("a = b\n");
  for (int i = 0; i < 3; ++i) {
    const auto line = source.Line(0);
    RecordStore store;
    line->WriteTo(&store);
    EXPECT_FALSE(shapes.Tell(*line, {}, TypingNames()));
  }
}

// ---- lines of a host's ----

TEST_F(Shapes, ALineOfAHostIsToldOnce) {
  for (int i = 0; i < 5; ++i) {
    const testing::CutSource source("x" + std::to_string(i) + " = f(y)\n");
    const auto line = source.Line(0);
    EXPECT_EQ(shapes_.AnalyzeSingleLogical(*line, false, false), std::nullopt);
    EXPECT_TRUE(line->parsed);
    const std::vector<std::string> records = testing::RecordStrings(*line);
    EXPECT_EQ(records, testing::AnalyzeLine(*source.Line(0)).records);
    EXPECT_EQ(shapes_.AnalyzeSingleLogical(*line, false, false), std::nullopt);
    EXPECT_EQ(testing::RecordStrings(*line), records);
  }
}

TEST_F(Shapes, ALineOfAHostThatWasStoppedIsAsIfItHadNotBegun) {
  const std::string text = "x = f(y)\n";
  for (int i = 0; i < 5; ++i) IsTold(text);
  const testing::CutSource source(text);
  const auto line = source.Line(0);
  {
    const ThreadStopQuestion stops([] { throw Stopped(); });
    stop::steps_left = 0;
    EXPECT_THROW(shapes_.AnalyzeSingleLogical(*line, false, false), Stopped);
  }
  EXPECT_FALSE(line->parsed);
  EXPECT_TRUE(testing::RecordStrings(*line).empty());
  EXPECT_EQ(shapes_.AnalyzeSingleLogical(*line, false, false), std::nullopt);
  EXPECT_FALSE(testing::RecordStrings(*line).empty());
}

// A host that is asked whether to stop may have other lines analysed.
TEST(Told, WhereAHostComesBackWhileAShapeIsLearnt) {
  CPGenAnalyzerImpl analyzer(AnalyzerOptions(testing::kPy3));
  const testing::CutSource other("z = w\n");
  for (const char* text : {"x = f(y)\n", "return x.y\n", "def f(a, b=c): pass\n"}) {
    StatementShapes shapes(analyzer, 1);
    int asked = 0;
    const ThreadStopQuestion comes_back([&] {
      if (asked++ > 0) return;
      const auto line = other.Line(0);
      EXPECT_EQ(shapes.AnalyzeSingleLogical(*line, false, false), std::nullopt);
      EXPECT_EQ(testing::RecordStrings(*line), testing::AnalyzeLine(*other.Line(0)).records);
    });
    const testing::CutSource source(text);
    for (int i = 0; i < 2; ++i) {
      const auto line = source.Line(0);
      stop::steps_left = 0;
      EXPECT_EQ(shapes.AnalyzeSingleLogical(*line, false, false), std::nullopt);
      EXPECT_EQ(testing::RecordStrings(*line), testing::AnalyzeLine(*source.Line(0)).records);
    }
    EXPECT_GT(asked, 1);
  }
}

// ---- that they are told right ----

TEST(Told, NamesThatMeanSomething) {
  Readers readers;
  for (const char* name : {"isinstance", "__debug__", "f", "instances1", "__debug_1", "super", "cast", "typing"}) {
    const std::string n(name);
    readers.Expect(Joined({"g(a, B)", "h(a.b, B)", "k(a, (B, C))", n + "(a, B)", n + "(a.b, B)", n + "(a, (B, C))",
                           "x = 1", n + " = 1", "f(y=1)", "f(" + n + "=1)", "def f(a): pass", "def f(" + n + "): pass",
                           "a." + n + "(b, C)", "for x in y: pass", "for " + n + " in y: pass"}));
  }
}

TEST(Told, EqualNames) {
  Readers readers;
  readers.Expect(Joined({"f(a=1, b=2)",
                         "f(c=1, d=2)",
                         "f(c=1, c=2)",
                         "def f(a, b): pass",
                         "def g(c, d): pass",
                         "def g(c, c): pass",
                         "a = b",
                         "b = c",
                         "c = c",
                         "a.b.c(d.e.f)",
                         "a.b.c(a.b.c)",
                         "a.b.c(a.b.d)",
                         "x = [a for b in c]",
                         "x = [d for e in f]",
                         "x = [a for a in a]",
                         "x = [a for a in b]",
                         "x = lambda a, b: c",
                         "x = lambda d, e: f",
                         "x = lambda a, a: a",
                         "f(1).a + f(2).a",
                         "f(3).b + f(4).b",
                         "f(1).a + f(1).a",
                         "f('x').a + f('y').a",
                         "f('x').a + f('x').a",
                         "f('(').a + f(')').a",
                         "f('[').a + f(']').a",
                         "f('').a + f(']').a",
                         "f('').a + f('').a",
                         "long_name_of_one.x = long_name_of_two.x",
                         "long_name_of_one.x = long_name_of_one.x"}));
}

TEST(Told, NumbersAndStrings) {
  std::vector<std::string> values = {
      "1",          "22",     "0x1F",  "1.5",    "1.",   ".5",     "1e5",      "1E5",        "1j",
      "0o17",       "017",    "1_000", "10L",    "0xe",  "'a'",    "\"b\"",    "'''c'''",    "'a b'",
      "'%s'",       "''",     "\"\"",  "''''''", "b'a'", "u'a'",   "r'a'",     "br'a'",      "ur'a'",
      "b''",        "u''",    "b'%'",  "u'%'",   "'\t'", "'\x01'", "r'\\d\t'", "'\xC3\xA4'", "'\xE2\x82\xAC'",
      "'''a\nb'''", "'\\\n'", "u'\t'"};
  Readers readers;
  std::vector<std::string> statements;
  for (const char* frame :
       {"x = @",           "return @",         "f(@)",       "x[@] = y",      "x = [@]",
        "x = {@: @}",      "x = @ + @",        "x = -@",     "a.b(@).c",      "x = (@, @)",
        "if x == @: pass", "def f(a=@): pass", "x = a[@:@]", "x = f(@)[@].y", "x = @.join(y)",
        "yield @",         "print(@ % a)",     "x = 'a' @",  "assert a, @",   "x = not @ if @ else @"}) {
    for (const std::string& value : values) {
      std::string statement;
      for (const char c : Text(frame)) c == '@' ? statement.append(value) : statement.append(1, c);
      statements.push_back(statement);
      statements.push_back(statement);
    }
  }
  readers.Expect(Joined(statements));
  readers.Expect(Joined(statements));
}

TEST(Told, OperatorsThatShareACode) {
  Readers readers;
  readers.Expect(Joined({"x = a != b", "x = c != d", "x = a <> b", "x = c <> d", "return a <> b", "return a != b",
                         "a @= b", "a -> b", "def f() -> a: pass", "def f() @= a: pass", "x = a == b", "x = a is b"}));
}

TEST(Told, LongOperatorExpressions) {
  Readers readers;
  std::vector<std::string> statements;
  for (const size_t length : {1, 10, 35, 37, 38, 39, 40, 41, 57, 58, 59, 60, 61, 200}) {
    const std::string a(length, 'a'), b(length, 'b'), c(length, 'c');
    statements.push_back("x = " + a + " + " + b + " + " + c);
    statements.push_back("x = " + a + " + " + b);
    statements.push_back("x = " + a + "+" + b);
    statements.push_back("x, y = " + a + " + " + b);
    statements.push_back("return " + a + "[" + b + "] + " + c);
    statements.push_back("x = '" + a + "' + '" + b + "'");
  }
  readers.Expect(Joined(statements));
  readers.Expect(Joined(statements));
}

TEST(Told, BlanksCommentsAndLineEnds) {
  Readers readers;
  std::vector<std::string> statements;
  for (const char* gap : {"", " ", "  ", "\t", "\n", "\n  ", "  # c\n", " \f"}) {
    for (const char* other : {"", " ", "\n"}) {
      const std::string g(gap), o(other);
      statements.push_back("x = (a" + g + "." + o + "b)");
      statements.push_back("f(a" + g + ".b," + o + "c)");
      statements.push_back("x[a" + g + "," + o + "b] = c");
      statements.push_back("f(a" + o + "," + g + "b).c = (d" + g + "+" + o + "e)");
      statements.push_back("x = [a" + g + "," + o + "b]");
    }
  }
  readers.Expect(Joined(statements));
  readers.Expect(Joined(statements));
}

TEST(Told, InTheirPlaces) {
  Readers readers;
  readers.Expect(
      "await(a)\nawait(b)\nasync def f():\n    await(a)\n    await(b)\n    await a\n    await b\n    return c\nawait "
      "a\nawait b\nreturn c\n"
      "def g():\n    await a\n    return c\n    yield d\nyield d\nclass A:\n    return c\n    yield d\n"
      "from a import *\ndef h():\n    from b import *\n    nonlocal x\nnonlocal y\nnonlocal z\n");
}

// What is told after a statement that was rejected was not rejected itself.
TEST(Told, AmongBrokenStatements) {
  Readers readers;
  const std::string source =
      "x = y\na b\n  x = y\nx = y\na b\nelse:\n  x = y\na b\nx = y\n  x = y\nbreak\na b\nbreak\n";
  readers.Expect(source);
  readers.Expect(source);
}

// Statements of the few hundred forms that come of putting fragments into one another.
TEST(Told, RandomStatements) {
  std::mt19937 random(20260101);
  const auto pick = [&random](const auto& choices) -> const auto& { return choices[random() % std::size(choices)]; };
  const char* const kFrames[] = {"E = E",
                                 "E",
                                 "E.n(E)",
                                 "n = E, E",
                                 "n, n = E",
                                 "return E",
                                 "for n in E: pass",
                                 "if E: pass",
                                 "n += E",
                                 "del E",
                                 "assert E, E",
                                 "raise E(E)",
                                 "import n.n",
                                 "from n.n import n as n",
                                 "def n(n, n=E): pass",
                                 "class n(E): pass",
                                 "with E as n: pass",
                                 "n: E = E",
                                 "except (n, n) as n: pass",
                                 "@n.n(E)",
                                 "print E",
                                 "global n, n",
                                 "while E: pass",
                                 "yield E",
                                 "n = n = E",
                                 "[n, n] = E",
                                 "n[E], n.n = E",
                                 "*n, n = E",
                                 "print(E, E, n=E)",
                                 "def n(*n, **n) -> E: pass",
                                 "n = yield E",
                                 "exec E in E",
                                 "lambda n, n=E: E"};
  const char* const kExpressions[] = {"n",
                                      "n",
                                      "n",
                                      "n.n",
                                      "1",
                                      "'n'",
                                      "'%'",
                                      "n(E)",
                                      "n(E, E)",
                                      "n[E]",
                                      "E + E",
                                      "(E)",
                                      "[E, E]",
                                      "{E: E}",
                                      "-E",
                                      "not E",
                                      "E if E else E",
                                      "[n for n in E]",
                                      "n(n=E)",
                                      "n(*E)",
                                      "None",
                                      "E.n",
                                      "E == E",
                                      "E ** E",
                                      "(E, E)",
                                      "n[E:E]",
                                      "n.n.n(E)",
                                      "isinstance(n, E)",
                                      "{E}",
                                      "1.5",
                                      "b'n'",
                                      "lambda n: E"};
  const char* const kNames[] = {"a", "b", "name", "a_longer_name", "isinstance", "self", "a_longer_nams", "x"};
  Readers readers;
  for (int round = 0; round < 60; ++round) {
    std::vector<std::string> statements;
    for (int form = 0; form < 12; ++form) {
      std::string text = pick(kFrames);
      for (int depth = 0; depth < 3; ++depth) {
        std::string grown;
        for (const char c : text) c == 'E' ? grown.append(depth < 2 ? pick(kExpressions) : "n") : grown.append(1, c);
        text = grown;
      }
      std::replace(text.begin(), text.end(), 'E', 'n');
      for (int member = 0; member < 6; ++member) {
        std::string statement;
        for (size_t i = 0; i < text.size(); ++i) {
          const auto is_letter = [&](size_t at) {
            return at < text.size() && std::isalpha(static_cast<unsigned char>(text[at]));
          };
          const bool is_hole = text[i] == 'n' && (i == 0 || !is_letter(i - 1)) && !is_letter(i + 1);
          is_hole ? statement.append(pick(kNames)) : statement.append(1, text[i]);
        }
        statements.push_back(statement);
      }
    }
    readers.Expect(Joined(statements));
    if (HasFailure()) break;
  }
}

// Every text of the tests and of the package, as each version.
TEST(Told, Files) {
  Readers readers;
  size_t count = 0;
  for (const char* folder : {"tests/golden", "examples", "python/quillet", "bench", "scripts"}) {
    const std::string path = std::string(QUILLET_SOURCE_DIR "/") + folder;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path)) {
      const std::string extension = entry.path().extension().string();
      if (!entry.is_regular_file() || (extension != ".py" && extension != ".txt" && extension != ".pyi")) continue;
      std::ifstream in(entry.path(), std::ios::binary);
      readers.Expect(std::string{std::istreambuf_iterator<char>(in), {}});
      ++count;
    }
  }
  EXPECT_GT(count, 50u);
}

}  // namespace
}  // namespace quillet
