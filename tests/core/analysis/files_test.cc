// A whole source at once: what it may take of memory and of the stack, and what its head decides.
#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "analysis/file_analyzer.h"
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

// ---- the stack ----

// Runs a function on a stack of half a mebibyte, as threads have it on some systems.
void OnSmallStack(std::function<void()> function) {
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setstacksize(&attributes, size_t{512} << 10);
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
