// A whole source at once: what it may take of memory and of the stack, and what its head decides.
#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "analysis/file_analyzer.h"
#include "foundations/stop.h"
#include "lines/future_imports.h"
#include "output/json_lines.h"
#include "output/text_lines.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

using testing::AnalyzerOptions;
using testing::ConsoleCapture;
using testing::kPy2;
using testing::kPy3;

FileAnalyzer::Options Options(Version version = kPy3) {
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = AnalyzerOptions(version);
  return options;
}

std::string Repeat(Text text, size_t count) {
  std::string repeated;
  for (size_t i = 0; i < count; ++i) repeated.append(text);
  return repeated;
}

// ---- what an error says ----

struct Broken {
  std::string source;
  std::string message = "";  // without "invalid syntax"
  Version version = kPy3;
};

TEST(Messages, SayWhatIsMissingWhereThatIsCertain) {
  const std::vector<Broken> table = {
      // The colon of a head.
      {"def add(self, item, count=1)\n", "1:29: expected ':'"},
      {"def add(self, item) -> int  # adds\n", "1:35: expected ':'"},
      {"if a and b[1:2]\n", "1:16: expected ':'"},
      {"class Basket(Base)\n", "1:19: expected ':'"},
      {"else\n", "1:5: expected ':'"},
      {"try\n", "1:4: expected ':'"},
      {"except (A, B) as e\n", "1:19: expected ':'"},
      {"with (open(a) as b)\n", "1:20: expected ':'"},
      {"def f[T](a)\n", "1:12: expected ':'"},
      {"async with a as b\n", "1:18: expected ':'"},
      {"def f(a) return a\n", "1:10: expected ':'"},
      {"if f(lambda x): pass\n", "1:14: expected ':'"},
      {"x = {a: b, c}\n", "1:13: expected ':'"},
      // Other words and signs.
      {"for x y:\n", "1:7: expected 'in'"},
      {"x = [y for y z]\n", "1:14: expected 'in'"},
      {"x = a if b\n", "1:11: expected 'else'"},
      {"from a\n", "1:7: expected 'import'"},
      {"a not b\n", "1:7: expected 'in'"},
      {"def f:\n", "1:6: expected '('"},
      {"def f a):\n", "1:7: expected '('"},
      // Brackets.
      {"x = f(a, g(b)\n", "1:14: '(' was never closed"},
      {"x = (a,\n     [b, c)\n", "2:11: expected ']'"},
      {"x = {\n", "1:6: '{' was never closed"},
      {"f(a\ndef g(): pass\n", "1:4: '(' was never closed"},
      {"x = [1 +\n", "1:9: '[' was never closed"},
      {"f(a b\n", "1:5: '(' was never closed"},
      {"class C[T: pass\n", "1:8: '[' was never closed"},
      {"@f(a\n", "1:5: '(' was never closed"},
      {"x = (a]\n", "1:7: expected ')'"},
      {"print `a\n", "1:9: expected '`'", kPy2},
      {"print a if b\n", "1:13: expected 'else'", kPy2},
  };
  for (const auto& [source, message, version] : table) {
    FileAnalyzer file(Options(version));
    file.Analyze(source);
    ASSERT_EQ(file.errors().size(), 1u) << source;
    const FileAnalyzer::Failure& error = file.errors()[0];
    const std::string at = std::to_string(error.place.line) + ":" + std::to_string(error.place.col);
    const size_t split = message.find(": ");
    EXPECT_EQ(at + " " + error.message(), message.substr(0, split) + " invalid syntax" + message.substr(split))
        << source;
  }
}

TEST(Messages, SayNoMoreWhereItIsNot) {
  const std::vector<Broken> table = {
      {"x = = 1\n"},
      {"x =\n"},
      {"x y\n"},
      {"if x = 1: pass\n"},  // the colon is there
      {"f(a b)\n"},          // the bracket is closed, and a comma may be missing as well
      {"f(a b]\n"},          // two things are wrong
      {"for x y in z: pass\n"},
      {"x = a if b c else d\n"},
      {"from a b import c\n"},
      {"x = 1)\n"},
      {"def (a): pass\n"},
      {"x = a if\n"},  // an expression comes first
      {"x = (a ? b)\n"},
      {"f('a, b)\n"},  // the string may hold the bracket
      {"f(a b, 'c)\n"},
      {"with (a := b): pass\n"},  // without its brackets it would end at the sign
      {"with (a := b)\n"},
      {"except A, B):\n"},  // the bracket in front is missing
      {"if a b] < c:\n"},
      {"x = (a if b] else c)\n"},
      {"@a or b\n"},
      {"case a +:\n"},
      {"def f[1](): pass\n"},
      {"import\n"},
      {"print 'a'\n"},
      {"x: int = 1\n", "", kPy2},
  };
  for (const Broken& broken : table) {
    FileAnalyzer file(Options(broken.version));
    file.Analyze(broken.source);
    ASSERT_EQ(file.errors().size(), 1u) << broken.source;
    EXPECT_EQ(file.errors()[0].message(), "invalid syntax") << broken.source;
  }
}

TEST(Messages, OfALoneAnalyzerAreBare) {
  for (const Text source : {"def f(a)\n", "f(a\n", "x = (a]\n"}) {
    EXPECT_TRUE(testing::Analyze(source).error.ends_with(" invalid syntax")) << source;
  }
}

// ---- the head of a file ----

TEST(PrintFunction, IsSwitchedOnForTheFileThatAsksForIt) {
  FileAnalyzer::Options options = Options(kPy2);
  options.print_function_grammar_file = options.grammar_file + "-print-function";
  FileAnalyzer file(options);
  const auto error_count = [&file](Text source) {
    file.Analyze(source);
    return file.errors().size();
  };
  const std::string future = "from __future__ import print_function\n";
  EXPECT_EQ(error_count("print a, b\n"), 0u);
  EXPECT_EQ(error_count("print(a, file=b)\n"), 1u);
  EXPECT_EQ(error_count(future + "print a, b\n"), 1u);
  EXPECT_EQ(error_count(future + "print(a, file=b)\n"), 0u);
  EXPECT_EQ(error_count("print a, b\n"), 0u) << "behind a file that asks for it";
  FileAnalyzer without_a_switch(Options(kPy2));
  without_a_switch.Analyze(future + "print a, b\n");
  EXPECT_EQ(without_a_switch.errors().size(), 0u);
}

// ---- memory ----

// What an analysis within a mebibyte says of a source; empty where it is fine.
std::string FailureWithinAMebibyte(Text source) {
  FileAnalyzer::Options options = Options();
  options.least_memory_limit = size_t{1} << 20;
  static FileAnalyzer file(options);
  try {
    file.Analyze(source);
  } catch (const Error& error) {
    return std::string(HostExceptionName(error.kind())) + ": " + error.message();
  }
  return {};
}

TEST(Memory, ASourceThatTakesTooMuchIsRefusedInOneLine) {
  const std::string refused = "OverflowError: too large to analyse within 1 MiB of memory";
  const std::pair<const char*, std::string> sources[] = {
      {"tokens", Repeat("(", 100'000)},
      {"lines", Repeat("\n", 100'000)},
      {"statements on a line", Repeat("a;", 50'000)},
      {"separators alone", Repeat(";", 50'000)},
      {"a tree", "x = [" + Repeat("1, ", 10'000) + "]\n"},
      {"records", Repeat("a = b.c\n", 12'000)},
      {"texts of records", "(" + Repeat("a, ", 2'000) + ") = f('" + Repeat("b", 20'000) + "')\n"},
  };
  for (const auto& [what, source] : sources) EXPECT_EQ(FailureWithinAMebibyte(source), refused) << what;
  EXPECT_EQ(FailureWithinAMebibyte("x = 1\n"), "") << "a source that is fine behind those that are not";
}

TEST(Memory, ExpressionsInStringsAndCommentsCount) {
  FileAnalyzer::Options options = Options();
  options.least_memory_limit = size_t{64} << 20;
  FileAnalyzer file(options);
  const std::string hint = Repeat("[", 2'000'000);
  for (const std::string& source : {"x: '" + hint + "'\n", "x = 1  # type: " + hint + "\n", "f'" + hint + "{x}'\n"}) {
    EXPECT_THROW(file.Analyze(source), Error) << source.substr(0, 20);
  }
  // A string that is no code, and one word, are one token each, however long.
  EXPECT_NO_THROW(file.Analyze("x = '" + hint + "'\n"));
  EXPECT_NO_THROW(file.Analyze("x: '" + Repeat("a", 2'000'000) + "'\n"));
  ASSERT_EQ(file.errors().size(), 0u);
}

TEST(Memory, ALargerSourceMayTakeTenTimesItsSize) {
  EXPECT_EQ(FailureWithinAMebibyte("x = '" + Repeat("b", 400'000) + "'\n"), "");
  EXPECT_EQ(FailureWithinAMebibyte("x = '" + Repeat("b", 400'000) + "'\ny = [" + Repeat("1, ", 10'000) + "]\n"), "");
}

TEST(Memory, WhatIsMadeOfTheResultsCounts) {
  FileAnalyzer::Options options = Options();
  options.least_memory_limit = size_t{1} << 20;
  FileAnalyzer file(options);
  // Within the limit by itself; each statement is shown with much of its line.
  file.Analyze("f('" + Repeat("b", 120) + "')" + Repeat("; a", 4'000) + "\n");
  ScopeNames scopes;
  scopes.Build(file);
  PlacedRecords placed;
  for (const bool json : {false, true}) {
    const std::unique_ptr<FileWriter> writer = json ? MakeJsonLinesWriter({}) : MakeTextLinesWriter({});
    std::string out;
    EXPECT_THROW(writer->Write({"a.py", {}, {}}, file, scopes, placed, out), Error);
    EXPECT_LT(out.size(), size_t{1} << 20);
  }
  EXPECT_NO_THROW(file.CheckMemory(0));
  EXPECT_THROW(file.CheckMemory(size_t{1} << 20), Error);
}

// ---- whole errors ----

FileAnalyzer::Found FoundIn(Text source, bool reads_completely) {
  FileAnalyzer::Options options = Options();
  options.keeps_whole_errors = true;
  options.reads_completely = reads_completely;
  FileAnalyzer file(options);
  file.Analyze(source);
  return file.TakeFound();
}

TEST(WholeErrors, AreMadeFromTheirStatementsWhereThoseAreWhatTheyShow) {
  // An error a byte is what the most of them can be.
  const FileAnalyzer::Found separators = FoundIn(";;;", true);
  ASSERT_EQ(separators.errors.size(), 3u);
  EXPECT_TRUE(separators.whole_errors.empty());
  for (size_t row = 0; row < 3; ++row) {
    const SyntaxError error = separators.WholeErrorOf(row);
    EXPECT_EQ(error.message(), "invalid syntax");
    EXPECT_EQ(error.filename, "<string>");
    EXPECT_EQ(error.text.substr(error.text.find_first_not_of(' ')), ";") << row;
  }
  const FileAnalyzer::Found hint = FoundIn("a = 1\nb = 2  # type: [\n", true);
  ASSERT_EQ(hint.errors.size(), 1u);
  EXPECT_TRUE(hint.whole_errors.empty());
  EXPECT_EQ(hint.WholeErrorOf(1).text, "b = 2  # type: [");
  EXPECT_EQ(hint.WholeErrorOf(1).offset, hint.errors[0].place.col);
}

TEST(WholeErrors, KeepATextOfTheirOwn) {
  const FileAnalyzer::Found field = FoundIn("a = 1\nb = f'{c +}'\n", false);
  ASSERT_EQ(field.errors.size(), 1u);
  ASSERT_EQ(field.whole_errors.size(), 1u);
  EXPECT_EQ(field.WholeErrorOf(1).text, field.whole_errors.at(1).text);
  EXPECT_EQ(field.WholeErrorOf(1).text.find("b ="), std::string::npos);
}

TEST(WholeErrors, AreOfTheClassesThatBlocksGiveThem) {
  const FileAnalyzer::Found blocks = FoundIn("if a:\nb = (\n", true);
  ASSERT_GE(blocks.results[1].error, 0);
  EXPECT_EQ(blocks.WholeErrorOf(1).error_class, SyntaxError::Kind::kIndentation);
  EXPECT_EQ(blocks.WholeErrorOf(1).text.substr(0, 5), "b = (");
}

// ---- steps ----

// How often an analysis asks whether it is still wanted: once for so many steps.
size_t QuestionsOf(FileAnalyzer& file, Text source) {
  size_t questions = 0;
  const ThreadStopQuestion count([&questions] { ++questions; });
  file.Analyze(source);
  return questions;
}

// Each line cuts off the one in front of it.
TEST(Steps, AreAsManyForEachOfAMillionLinesThatCutOneAnotherOff) {
  constexpr size_t kCount = 1'000'000;
  const std::string unit = "f(\ndef g(\n";
  FileAnalyzer file(Options());
  const size_t few = QuestionsOf(file, Repeat(unit, kCount / 16));
  EXPECT_EQ(file.errors().size(), kCount / 16 + 1);
  const size_t many = QuestionsOf(file, Repeat(unit, kCount));
  EXPECT_EQ(file.errors().size(), kCount + 1);
  EXPECT_EQ(file.results().size(), kCount + 1);
  EXPECT_GT(few, 0u);
  EXPECT_LE(many, 16 * few + 16);
  EXPECT_LT(static_cast<int64_t>(many) * kStepsBetweenQuestions, int64_t{64} * kCount);
}

// ---- the stack ----

#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
constexpr size_t kSmallStack = size_t{4} << 20;  // frames are several times as large
#else
constexpr size_t kSmallStack = size_t{512} << 10;
#endif

// Runs a function on a stack of half a mebibyte, as threads have it on some systems.
void OnSmallStack(std::function<void()> function) {
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setstacksize(&attributes, kSmallStack);
  pthread_t thread;
  const auto run = [](void* argument) -> void* {
    (*static_cast<std::function<void()>*>(argument))();
    return nullptr;
  };
  ASSERT_EQ(pthread_create(&thread, &attributes, run, &function), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

// `quillet_scaling` of bench/ tries hundreds of these at a million.
TEST(Steps, AreCountedWhileOutputIsWritten) {
  FileAnalyzer file(Options());
  // Errors alone, which have no records, and statements that are shown with much of their line.
  for (const std::string& source :
       {Repeat(";", 50'000), "f('" + Repeat("b", 120) + "')" + Repeat("; a", 50'000) + "\n"}) {
    file.Analyze(source);
    ScopeNames scopes;
    scopes.Build(file);
    PlacedRecords placed;
    for (const bool json : {false, true}) {
      const std::unique_ptr<FileWriter> writer = json ? MakeJsonLinesWriter({}) : MakeTextLinesWriter({});
      std::string out;
      size_t questions = 0;
      const ThreadStopQuestion count([&questions] { ++questions; });
      writer->Write({"a.py", {}, {}}, file, scopes, placed, out);
      EXPECT_GE(questions, out.size() / (32 * kStepsBetweenQuestions)) << source.substr(0, 8) << json;
      EXPECT_GE(out.size(), 64 * kStepsBetweenQuestions);
    }
  }
}

TEST(Stack, NothingNestsOnTheMachineStackWithoutABound) {
  constexpr size_t kDepth = 20'000;
  const std::vector<std::vector<std::string>> nests = {
      {"x = ", "(", "a", ")", ""},
      {"x = ", "[", "a", "]", ""},
      {"x = ", "{a: ", "b", "}", ""},
      {"x = ", "f(", "a", ")", ""},
      {"x = ", "a[", "b", "]", ""},
      {"", "(a, ", "b", ")", " = c"},
      {"for ", "(a, ", "b", ")", " in c: pass"},
      {"x = ", "-", "a", "", ""},
      {"x = ", "not ", "a", "", ""},
      {"x = ", "lambda: ", "a", "", ""},
      {"x = ", "lambda a=", "b", ": c", ""},
      {"x = ", "", "a", " if b else c", ""},
      {"x = ", "(a := ", "b", ")", ""},
      {"x = ", "", "a", "**b", ""},
      {"x = ", "", "a", ".b()", ""},
      {"x = ", "[a for a in ", "b", "]", ""},
      {"case ", "[", "a", "]", ":"},
      {"case ", "A(", "a", ")", ":"},
      {"match ", "(", "a", ")", ":"},
      {"def f(", "(a, ", "b", ")", "): pass"},
      {"class A[T: ", "a[", "b", "]", "]: pass"},
      {"", "def f[T: (", "a", ")](): pass", ""},
      {"x = f'{", "(", "a", ")", "}'"},
      {"x = ", "f'{", "a", "}'", ""},
      {"x: '", "[", "a", "]", "'"},
      {"x: ", "a['b', ", "c", "]", ""},
      {"x = 1 # type: ", "[", "a", "]", ""},
      {"(a, b) = c # type: ", "(d, ", "e", ")", ""},
      {"def f(a): # type: ", "(", "a", ")", " -> b"},
      {"", "if a: ", "b", "", ""},
      {"", "(", "", "", ""},
      {"x = (", "(yield ", "a", ")", ")"},
      {"isinstance(a, ", "(b, ", "c", ")", ")"},
      {"async def f(): ", "await ", "a", "", ""},
  };
  FileAnalyzer py3(Options(kPy3));
  FileAnalyzer py2(Options(kPy2));
  const ConsoleCapture console;
  for (const std::vector<std::string>& nest : nests) {
    const std::string source = nest[0] + Repeat(nest[1], kDepth) + nest[2] + Repeat(nest[3], kDepth) + nest[4] + "\n";
    OnSmallStack([&] {
      py3.Analyze(source);
      py2.Analyze(source);
    });
    EXPECT_EQ(py3.results().size(), py3.rows().size()) << nest[0] << nest[1];
  }
}

}  // namespace
}  // namespace quillet
