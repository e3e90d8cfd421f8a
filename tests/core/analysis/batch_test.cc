// Many files at once: order, threads, what becomes of files that cannot be read, and what is said of
// each record: its place, its scope, its words.
#include "analysis/batch.h"

#include <gtest/gtest.h>
#ifndef _WIN32
#include <pthread.h>
#include <sys/wait.h>
#include <unistd.h>
#endif

#include <atomic>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "analysis/source_bytes.h"
#include "output/arrow_export.h"
#include "output/arrow_stream.h"
#include "output/json_lines.h"
#include "output/text_lines.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

using testing::AnalyzerOptions;
using testing::kPy2;
using testing::kPy3;
using Strings = std::vector<std::string>;

BatchAnalyzer::Options Options(unsigned jobs = 2, Version version = kPy3) {
  BatchAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options.analyzer) = AnalyzerOptions(version);
  options.jobs = jobs;
  return options;
}

BatchInput Source(std::string path, std::string bytes) { return {std::move(path), std::move(bytes), {}}; }

std::vector<BatchResult> ResultsOf(BatchAnalyzer::Options options, std::vector<BatchInput> inputs) {
  BatchAnalyzer batch(std::move(options), std::move(inputs));
  std::vector<BatchResult> results;
  BatchResult result;
  while (batch.Next(result)) results.push_back(std::move(result));
  return results;
}

BatchResult ResultOf(std::string source, Version version = kPy3) {
  return std::move(ResultsOf(Options(1, version), {Source("a.py", std::move(source))}).at(0));
}

// A record as "line:column scope|name kind detail", with "arg " in front for parameters.
std::string ShowRecord(const RecordTable& table, size_t i) {
  std::string shown = table.is_parameter[i] ? "arg " : "";
  shown += std::to_string(table.lines[i]) + ":" + std::to_string(table.columns[i]) + " ";
  shown.append(table.ScopeAt(i))
      .append("|")
      .append(table.NameAt(i))
      .append(" ")
      .append(RecordKindWords()[static_cast<size_t>(table.kinds[i])]);
  if (!table.DetailAt(i).empty()) shown.append(" ").append(table.DetailAt(i));
  return shown;
}

// The records of a source whose name is `name`, or all of them.
Strings RecordsOf(std::string source, Text name = kNoText, Version version = kPy3) {
  const BatchResult result = ResultOf(std::move(source), version);
  EXPECT_EQ(result.problem, "");
  Strings records;
  for (size_t i = 0; i < result.table.size(); ++i)
    if (IsNone(name) || result.table.NameAt(i) == name) records.push_back(ShowRecord(result.table, i));
  return records;
}

// ---- places ----

TEST(Places, ANameStandsWhereTheSourceSpellsIt) {
  EXPECT_EQ(RecordsOf("x = a.b(\n    c)\n"), (Strings{"1:1 |x set", "1:1 |x equal a.b(c)", "1:5 |a.b called (c)",
                                                      "1:5 |a get", "1:5 |a.b get", "2:5 |c get"}));
}

TEST(Places, ColumnsCountBytesBehindAByteOrderMark) {
  EXPECT_EQ(RecordsOf("\xEF\xBB\xBFx; \xC3\xA9; y\n"), (Strings{"1:1 |x get", "1:4 |\xC3\xA9 get", "1:8 |y get"}));
}

TEST(Places, ANameInAFormattedStringStandsInTheString) {
  EXPECT_EQ(RecordsOf("f'{a} {b.c}'\n"), (Strings{"1:4 |a get", "1:8 |b get", "1:8 |b.c get"}));
}

TEST(Places, TheHintOfAParameterStandsAtTheParameter) {
  EXPECT_EQ(RecordsOf("def f(a, b: int): pass\n", "b"), (Strings{"arg 1:10 f|b set", "arg 1:10 f|b hint int"}));
}

TEST(Places, ANameWithAHintStandsWhereTheHintIsAndNowhereElse) {
  EXPECT_EQ(RecordsOf("y: T = f(1)[\n z].y\n", "y"),
            (Strings{"1:1 |y set", "1:1 |y equal f(1)[z].y", "1:1 |y hint T"}));
  EXPECT_EQ(RecordsOf("def f(b: a, a: int): pass\n", "a"),
            (Strings{"1:10 |a get", "arg 1:13 f|a set", "arg 1:13 f|a hint int"}));
  EXPECT_EQ(RecordsOf("def f(b=a, a=1):  # type: (int, str) -> None\n  pass\n", "a"),
            (Strings{"1:9 |a get", "arg 1:12 f|a set", "arg 1:12 f|a literal int: 1", "arg 1:12 f|a hint str"}));
  EXPECT_EQ(RecordsOf("z.a, a = 1, 2  # type: int, str\n", "a").back(), "1:6 |a hint str");
}

TEST(Places, ANameWithBlanksBetweenItsPartsStandsWhereTheStatementSpellsIt) {
  EXPECT_EQ(RecordsOf("x = x.  y(1)\n", "x.y"), (Strings{"1:5 |x.y called (1)", "1:5 |x.y get"}));
  EXPECT_EQ(RecordsOf("q.x = x.z, x.\\\n y\n", "x.y"), (Strings{"1:12 |x.y get"}));
  EXPECT_EQ(RecordsOf("x(x, 'a'  .join)\n", "'a'.join"), (Strings{"1:6 |'a'.join get"}));
  // Spelled with brackets that the name lacks: where its first part is, which no dot is in front of.
  EXPECT_EQ(RecordsOf("q.x + x[(1)] .y\n", "x[1].y"), (Strings{"1:7 |x[1].y get"}));
  std::string row;
  for (int i = 0; i < 249; ++i) row += "a,";
  // The last token that is looked at, and the one behind it.
  EXPECT_EQ(RecordsOf("(" + row + "x .y)\n", "x.y"), (Strings{"1:500 |x.y get"}));
  EXPECT_EQ(RecordsOf("-(" + row + "x .y)\n", "x.y"), (Strings{"1:1 |x.y get"}));
  const std::string arguments(300, 'a');
  EXPECT_EQ(RecordsOf("x[0]; x + x[" + arguments + "] .y\n", "x[" + arguments + "].y"),
            (Strings{"1:11 |x[" + arguments + "].y get"}));
}

TEST(Places, ANameThatTheStatementDoesNotSpellStandsAtItsFirstToken) {
  EXPECT_EQ(RecordsOf("if a: return (\\\n 1)\n", "return"), (Strings{"1:7 |return literal int: 1"}));
  EXPECT_EQ(RecordsOf("x\n  \\\n y\ndef f(a) -> int: pass\n", "return"), (Strings{"arg 4:1 f|return hint int"}));
}

// ---- scopes ----

TEST(Scopes, AStatementBelongsToTheDefinitionsAroundIt) {
  EXPECT_EQ(RecordsOf("x\nclass A:\n  x\n  def f(self):\n    x\n    class B:\n      x\n  x\nx\n", "x"),
            (Strings{"1:1 |x get", "3:3 A|x get", "5:5 A.f|x get", "7:7 A.f.B|x get", "8:3 A|x get", "9:1 |x get"}));
}

TEST(Scopes, AHeadsOwnNamesBelongToTheScopeAroundAndItsParametersToTheScopeItOpens) {
  EXPECT_EQ(RecordsOf("class A(B):\n  def f[T: U](x=y) -> z: pass\n"),
            (Strings{"1:7 |A set", "1:9 |B get", "2:7 A|f set", "2:12 A|U get", "2:17 A|y get", "2:23 A|z get",
                     "arg 2:9 A.f|T type_parameter U", "arg 2:15 A.f|x set", "arg 2:15 A.f|x equal y",
                     "arg 2:3 A.f|return hint z"}));
}

TEST(Scopes, ABodyOnTheHeadsLineBelongsToTheDefinition) {
  EXPECT_EQ(RecordsOf("def f(): x; y\nx\n"), (Strings{"1:5 |f set", "1:10 f|x get", "1:13 f|y get", "2:1 |x get"}));
}

TEST(Scopes, StoresInsideExpressionsStayWithTheirStatement) {
  EXPECT_EQ(RecordsOf("def f():\n  return [i for i in j]\n", "i"), (Strings{"2:11 f|i get", "2:17 f|i within_expr 4"}));
}

TEST(Scopes, TheParametersOfATypeAliasBelongToTheAlias) {
  EXPECT_EQ(RecordsOf("type X[T: int] = T\n", "X"), (Strings{"1:6 |X set", "1:6 |X equal T"}));
  for (const std::string& record : RecordsOf("type X[T: int] = T\n", "T"))
    EXPECT_NE(record.find(record.starts_with("arg") ? " X|T" : " |T"), std::string::npos) << record;
}

TEST(Scopes, AGlobalNameBelongsToTheModule) {
  EXPECT_EQ(RecordsOf("def f():\n  g.x = 1\n  global g\n  g = h\n  def k(): g\n", "g"),
            (Strings{"2:3 |g get", "3:10 f|g global", "4:3 |g set", "4:3 |g equal h", "5:12 f.k|g get"}));
  EXPECT_EQ(RecordsOf("def f():\n  global g\n  g.x[0] = 1\n", "g.x[0]"), (Strings{"3:3 |g.x[0] literal int: 1"}));
}

TEST(Scopes, ANonlocalNameBelongsToTheNearestFunctionThatBindsIt) {
  const std::string source =
      "def a(n):\n  def b():\n    class C:\n      def d(self):\n        nonlocal n, m\n        n = m\n";
  EXPECT_EQ(RecordsOf(source, "n").back(), "6:9 a|n equal m");
  // Nobody binds it: the nearest function, past the class.
  EXPECT_EQ(RecordsOf(source, "m").back(), "6:13 a.b|m get");
}

TEST(Scopes, ANonlocalNamePassesThroughAFunctionThatDeclaresItToo) {
  EXPECT_EQ(RecordsOf("def a():\n  n = 1\n  def b():\n    nonlocal n\n    n = 2\n    def c():\n      nonlocal n\n"
                      "      n = 3\n",
                      "n")
                .back(),
            "8:7 a|n literal int: 3");
}

TEST(Scopes, ADeclarationWithoutAFunctionAroundChangesNothing) {
  EXPECT_EQ(RecordsOf("global g\ng\n", "g"), (Strings{"1:8 |g global", "2:1 |g get"}));
  EXPECT_EQ(RecordsOf("def f():\n  nonlocal n\n  n\n", "n"), (Strings{"2:12 f|n nonlocal", "3:3 f|n get"}));
}

TEST(Scopes, ASignatureCommentGivesFactsAboutItsFunctionsParameters) {
  EXPECT_EQ(RecordsOf("def f(a, b):\n  # type: (int, str) -> bool\n  pass\n", "b"),
            (Strings{"arg 1:10 f|b set", "arg 2:3 f|b hint str"}));
  EXPECT_EQ(RecordsOf("def f(a, b):\n  # type: (int, str) -> bool\n  pass\n", "return"),
            (Strings{"arg 2:3 f|return hint bool"}));
}

TEST(Scopes, ASignatureCommentOfAMethodMayLeaveOutTheObject) {
  const std::string head = "class A:\n  def f(self, a):\n    # type: (";
  EXPECT_EQ(RecordsOf(head + "int) -> bool\n    pass\n", "a").back(), "arg 3:5 A.f|a hint int");
  EXPECT_EQ(RecordsOf(head + "A, int) -> bool\n    pass\n", "a").back(), "arg 3:5 A.f|a hint int");
  EXPECT_EQ(RecordsOf("def f():\n  # type: (int) -> bool\n  pass\n", "<argument 0>"),
            (Strings{"arg 2:3 f|<argument 0> hint int"}));
  EXPECT_EQ(RecordsOf("def f():\n  # type: (int, str) -> bool\n  pass\n", "<argument 1>"),
            (Strings{"arg 2:3 f|<argument 1> hint str"}));
}

TEST(Scopes, DefinitionsAreListedWithTheirExtent) {
  const BatchResult result = ResultOf("@d\nclass A:\n  def f(self):\n    x\n\n    # end\n  y = 1\n\ndef (: pass\n");
  ASSERT_EQ(result.table.definitions.size(), 3u);
  const auto shown = [&](size_t i) {
    const RecordTable::Definition& found = result.table.definitions[i];
    return std::string(result.table.scope_texts[found.scope]) + " " + std::to_string(found.line) + ":" +
           std::to_string(found.column) + " " + std::to_string(found.first_line) + "-" +
           std::to_string(found.last_line);
  };
  EXPECT_EQ(shown(0), "A 2:7 2-7");
  EXPECT_EQ(shown(1), "A.f 3:7 3-4");
  EXPECT_EQ(shown(2), "<no name> 9:1 9-9");
}

TEST(Scopes, ANameThatOpensOneIsMarked) {
  const RecordTable table =
      ResultOf("class A:\n  def f(self, g=A): pass\nasync def f(): pass\ntype T = f\nf = A\n").table;
  Strings marked;
  for (size_t i = 0; i < table.size(); ++i) {
    if (table.opens[i] == RecordTable::Opens::kNothing) continue;
    marked.push_back(ShowRecord(table, i) + (table.opens[i] == RecordTable::Opens::kClass ? " class" : " def"));
  }
  EXPECT_EQ(marked, (Strings{"1:7 |A set class", "2:7 A|f set def", "3:11 |f set def"}));
}

TEST(Scopes, DeepAndLongNamesStayBounded) {
  std::string source;
  for (size_t depth = 0; depth < 2000; ++depth) source += std::string(depth, ' ') + "def name(a):\n";
  const BatchResult result = ResultOf(source);
  EXPECT_EQ(result.table.definitions.size(), 2000u);
  const TextList& scopes = result.table.scope_texts;
  for (size_t i = 0; i < scopes.size(); ++i) EXPECT_LE(scopes[i].size(), ScopeNames::kMaxNameSize);
  EXPECT_EQ(ResultOf("class " + std::string(100'000, 'a') + ":\n  x = 1\n").table.scope_texts.size(), 1u);
}

TEST(Texts, EachStandsInTheTableOnce) {
  const RecordTable table = ResultOf("x = y\ndef x(y): pass\nx(y)\nz(y)\n").table;
  Strings names, details;
  for (size_t i = 0; i < table.name_texts.size(); ++i) names.emplace_back(table.name_texts[i]);
  for (size_t i = 0; i < table.detail_texts.size(); ++i) details.emplace_back(table.detail_texts[i]);
  EXPECT_EQ(names, (Strings{"x", "y", "z"}));
  EXPECT_EQ(details, (Strings{"", "y", "(y)"}));
}

TEST(Texts, ThoseOfAllRecordsGrowWithTheSourceAndNotItsSquare) {
  std::string source = "x = y\nz = a";
  for (int i = 0; i < 20'000; ++i) source += ".a";
  const BatchResult result = ResultOf(source + "\n");
  EXPECT_LT(result.table.name_texts.bytes.size() + result.table.detail_texts.bytes.size(),
            PlacedRecords::kSmallestBudget + PlacedRecords::kBudgetPerSourceByte * source.size() +
                result.table.size() * (PlacedRecords::kCutSize + 8));
  EXPECT_GT(result.table.size(), 20'000u);
  EXPECT_TRUE(result.table.NameAt(result.table.size() - 1).ends_with("\xE2\x80\xA6"));
}

TEST(Texts, OddBytesAreShownAsEscapes) {
  const Strings records = RecordsOf("x = '\xFF'\n");
  EXPECT_EQ(records, (Strings{"1:1 |x set", "1:1 |x literal str: '\\xff'"}));
}

// ---- batches ----

std::vector<BatchInput> ManySources(size_t count) {
  std::vector<BatchInput> inputs;
  for (size_t i = 0; i < count; ++i) {
    std::string source;
    // Files of very unequal sizes, so that threads finish out of order.
    for (size_t line = 0; line < (i % 7 == 0 ? 300 : 3); ++line)
      source += "name" + std::to_string(i) + " = call(" + std::to_string(line) + ")\n";
    if (i % 5 == 0) source += "x = = 1\n";
    inputs.push_back(Source("file" + std::to_string(i) + ".py", source));
  }
  return inputs;
}

TEST(Batch, ResultsComeInTheOrderOfTheInputs) {
  const std::vector<BatchResult> results = ResultsOf(Options(4), ManySources(200));
  ASSERT_EQ(results.size(), 200u);
  for (size_t i = 0; i < results.size(); ++i) {
    EXPECT_EQ(results[i].index, i);
    EXPECT_EQ(results[i].table.NameAt(0), "name" + std::to_string(i));
    EXPECT_EQ(results[i].errors.size(), i % 5 == 0 ? 1u : 0u);
  }
}

TEST(Batch, OutputIsTheSameWhateverTheNumberOfThreads) {
  const auto output_of = [](unsigned jobs, bool json) {
    BatchAnalyzer::Options options = Options(jobs);
    options.most_waiting = jobs;
    options.make_writer = [json] { return json ? MakeJsonLinesWriter({}) : MakeTextLinesWriter({}); };
    std::string output;
    for (const BatchResult& result : ResultsOf(std::move(options), ManySources(100))) output += result.output;
    return output;
  };
  for (const bool json : {false, true}) {
    const std::string expected = output_of(1, json);
    EXPECT_GT(expected.size(), 10'000u);
    for (const unsigned jobs : {2u, 3u, 8u}) EXPECT_EQ(output_of(jobs, json), expected);
  }
}

TEST(Batch, AnEmptyListEndsAtOnce) { EXPECT_TRUE(ResultsOf(Options(), {}).empty()); }

TEST(Batch, ThreadsStayWithinTheirBoundsOfTheReader) {
  static std::atomic<size_t> written{0};
  written = 0;
  class Counting : public FileWriter {
   public:
    void Write(const BatchInput&, const FileAnalyzer&, const ScopeNames&, PlacedRecords&, std::string& out) override {
      out.assign(1000, 'x');
      ++written;
    }
  };
  const size_t no_bound = BatchAnalyzer::Options().most_waiting_bytes;
  // Where no byte may wait, what is handed out next is still made.
  for (const size_t most_bytes : {no_bound, size_t{1}, size_t{0}}) {
    written = 0;
    BatchAnalyzer::Options options = Options(4);
    options.most_waiting = most_bytes == no_bound ? 5 : 1000;
    options.most_waiting_bytes = most_bytes;
    options.make_writer = [] { return std::make_unique<Counting>(); };
    BatchAnalyzer batch(std::move(options), ManySources(100));
    BatchResult result;
    for (size_t handed_out = 1; batch.Next(result); ++handed_out) {
      if (handed_out % 20 == 1) std::this_thread::sleep_for(std::chrono::milliseconds(20));
      // By bytes, a thread may be at work for each job when the bound is met.
      EXPECT_LE(written, handed_out + 5);
    }
    EXPECT_EQ(written, 100u);
  }
}

TEST(Batch, CancellingEndsItEarly) {
  BatchAnalyzer batch(Options(2), ManySources(500));
  BatchResult result;
  EXPECT_TRUE(batch.Next(result));
  batch.Cancel();
  EXPECT_FALSE(batch.Next(result));
  BatchAnalyzer never_started(Options(2), ManySources(3));
  never_started.Cancel();
  EXPECT_FALSE(never_started.Next(result));
}

TEST(Batch, CancellingWakesAReaderThatWaits) {
  const std::string pipe = ::testing::TempDir() + "/quillet_batch_pipe";
  std::remove(pipe.c_str());
  ASSERT_EQ(std::system(("mkfifo " + pipe).c_str()), 0);
  BatchAnalyzer batch(Options(1), {{pipe, std::nullopt, {}}});
  BatchResult result;
  EXPECT_EQ(batch.Next(result, std::chrono::milliseconds(50)), BatchAnalyzer::Wait::kTimeout);
  std::thread canceller([&batch] {
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    batch.Cancel();
  });
  EXPECT_FALSE(batch.Next(result));
  canceller.join();
  std::remove(pipe.c_str());
}

TEST(Batch, AFileIsReadUpToALimit) {
  constexpr size_t kMost = size_t{3} << 20;
  const std::string path = ::testing::TempDir() + "/quillet_batch_large";
  std::remove(path.c_str());
  ASSERT_EQ(std::system(("truncate -s " + std::to_string(kMost) + " " + path).c_str()), 0);
  std::string bytes;
  EXPECT_EQ(ReadSourceFile(path, bytes, kMost), "");
  EXPECT_EQ(bytes.size(), kMost);
  EXPECT_EQ(ReadSourceFile(path, bytes, kMost - 1), "the source is too large: more than 2 MiB");
  std::remove(path.c_str());
  // One whose size nobody knows before.
  ASSERT_EQ(std::system(("mkfifo " + path).c_str()), 0);
  for (const size_t most : {kMost, kMost - 1}) {
    std::thread writer([&path] {
      std::ofstream pipe(path, std::ios::binary);
      pipe << std::string(kMost, 'x');
    });
    EXPECT_EQ(ReadSourceFile(path, bytes, most), most == kMost ? "" : "the source is too large: more than 2 MiB");
    EXPECT_EQ(bytes.size(), most == kMost ? kMost : 0);
    writer.join();
  }
  std::remove(path.c_str());
}

// ---- how it ends, whatever happens to the process ----

// A source of one statement that takes long.
std::string LongStatement(size_t names) {
  std::string source = "x = [";
  for (size_t i = 0; i < names; ++i) source += "name, ";
  return source + "]\n";
}

TEST(Batch, CancellingEndsTheFileUnderWay) {
  std::vector<BatchInput> inputs;
  for (int i = 0; i < 8; ++i) inputs.push_back(Source("a.py", LongStatement(300'000)));
  BatchAnalyzer batch(Options(2), std::move(inputs));
  batch.Start();
  batch.Cancel();
  BatchResult result;
  EXPECT_FALSE(batch.Next(result));
}

TEST(Batch, SeveralReadersShareTheResults) {
  BatchAnalyzer batch(Options(3), ManySources(200));
  std::atomic<size_t> sum{0};
  std::vector<std::thread> readers;
  for (int i = 0; i < 4; ++i) {
    readers.emplace_back([&] {
      BatchResult result;
      while (batch.Next(result)) sum += result.index + 1;
    });
  }
  for (std::thread& reader : readers) reader.join();
  EXPECT_EQ(sum, 200u * 201 / 2);
}

TEST(Batch, WithoutItsThreadsTheReaderGoesOn) {
  for (const size_t before : {0u, 1u, 40u}) {
    BatchAnalyzer batch(Options(3), ManySources(100));
    BatchResult result;
    std::vector<size_t> seen;
    std::thread reader([&] {
      while (batch.Next(result)) {
        seen.push_back(result.index);
        EXPECT_EQ(result.table.NameAt(0), "name" + std::to_string(result.index));
        if (seen.size() == before) batch.DismissThreads();
      }
    });
    if (before == 0) batch.DismissThreads();
    reader.join();
    ASSERT_EQ(seen.size(), 100u);
    for (size_t i = 0; i < seen.size(); ++i) EXPECT_EQ(seen[i], i);
  }
}

#ifdef __GLIBC__
// While it lives no thread can be started: its stack would be larger than the memory there is.
class NoThreads {
 public:
  NoThreads() {
    pthread_getattr_default_np(&before_);
    pthread_attr_t huge;
    pthread_getattr_default_np(&huge);
    pthread_attr_setstacksize(&huge, size_t{1} << 46);
    pthread_setattr_default_np(&huge);
    pthread_attr_destroy(&huge);
  }
  ~NoThreads() {
    pthread_setattr_default_np(&before_);
    pthread_attr_destroy(&before_);
  }
  NoThreads(const NoThreads&) = delete;
  NoThreads& operator=(const NoThreads&) = delete;

 private:
  pthread_attr_t before_;
};

TEST(Batch, TheReaderDoesTheWorkWhereNoThreadCanBeStarted) {
  const NoThreads no_threads;
  ASSERT_THROW(std::thread([] {}).join(), std::system_error);
  BatchAnalyzer batch(Options(4), ManySources(50));
  batch.Start();
  BatchResult result;
  for (size_t i = 0; i < 50; ++i) {
    ASSERT_TRUE(batch.Next(result));
    EXPECT_EQ(result.index, i);
    EXPECT_EQ(result.table.NameAt(0), "name" + std::to_string(i));
  }
  EXPECT_FALSE(batch.Next(result));
}

TEST(Batch, AReaderThatDoesTheWorkMayStopAndGoOn) {
  const NoThreads no_threads;
  BatchAnalyzer batch(Options(1), {Source("a.py", LongStatement(200'000)), Source("b.py", "x\n")});
  BatchResult result;
  {
    const ThreadStopQuestion stops([] { throw Stopped(); });
    EXPECT_THROW(batch.Next(result), Stopped);
  }
  ASSERT_TRUE(batch.Next(result));
  EXPECT_EQ(result.index, 0u);
  EXPECT_EQ(result.problem, "");
  EXPECT_GT(result.table.size(), 0u);
  batch.Cancel();
  EXPECT_FALSE(batch.Next(result));
}
#endif

#if !defined(_WIN32) && !defined(__SANITIZE_THREAD__)
// What a child process found in the rest of a batch: 0 where that is right.
int RestInChild(BatchAnalyzer& batch, size_t next, size_t count) {
  BatchResult result;
  for (; next < count; ++next) {
    if (!batch.Next(result) || result.index != next) return 1;
    if (result.table.NameAt(0) != "name" + std::to_string(next)) return 2;
  }
  return batch.Next(result) ? 3 : 0;
}

TEST(Batch, AForkLeavesTwoBatches) {
  for (const bool cancels : {false, true}) {
    auto batch = std::make_unique<BatchAnalyzer>(Options(2), ManySources(100));
    BatchResult result;
    for (int i = 0; i < 10; ++i) ASSERT_TRUE(batch->Next(result));
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      if (cancels) batch->Cancel();
      const int code = cancels ? batch->Next(result) : RestInChild(*batch, 10, 100);
      batch.reset();
      _exit(code);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 0);
    for (size_t i = 10; i < 100; ++i) {
      ASSERT_TRUE(batch->Next(result));
      EXPECT_EQ(result.index, i);
    }
    EXPECT_FALSE(batch->Next(result));
  }
}

TEST(Batch, AForkedBatchMayBeDroppedUnread) {
  auto batch = std::make_unique<BatchAnalyzer>(Options(2), ManySources(100));
  BatchResult result;
  ASSERT_TRUE(batch->Next(result));
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    batch.reset();
    _exit(0);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
}
#endif

// ---- files ----

class Files : public ::testing::Test {
 protected:
  Files() : folder_(std::filesystem::path(::testing::TempDir()) / "quillet_batch_files") {
    std::filesystem::create_directories(folder_);
  }
  ~Files() override { std::filesystem::remove_all(folder_); }

  std::string Write(const std::string& name, const std::string& bytes) const {
    const std::string path = (folder_ / name).string();
    std::ofstream(path, std::ios::binary) << bytes;
    return path;
  }

  std::filesystem::path folder_;
};

TEST_F(Files, AreReadWhole) {
  std::string big;
  for (int i = 0; i < 20'000; ++i) big += "x = 1  # line\n";
  const std::vector<BatchResult> results = ResultsOf(
      Options(), {{Write("big.py", big), {}, {}}, {Write("empty.py", ""), {}, {}}, {Write("a\nb.py", "x"), {}, {}}});
  EXPECT_EQ(results[0].line_count, 20'000u);
  EXPECT_EQ(results[0].statement_count, 20'000u);
  EXPECT_EQ(results[0].byte_count, big.size());
  EXPECT_EQ(results[0].table.size(), 40'000u);
  EXPECT_EQ(results[1].line_count, 0u);
  EXPECT_EQ(results[1].problem, "");
  EXPECT_EQ(results[2].line_count, 1u);
}

TEST_F(Files, ThatCannotBeReadAreResults) {
  const std::vector<BatchResult> results = ResultsOf(Options(), {{(folder_ / "missing.py").string(), {}, {}},
                                                                 {folder_.string(), {}, {}},
                                                                 {std::string("a\0b", 3), {}, {}},
                                                                 {"given.py", {}, "said before"},
                                                                 {Write("good.py", "x\n"), {}, {}}});
  EXPECT_EQ(results[0].problem, "No such file or directory");
  EXPECT_EQ(results[1].problem, "Is a directory");
  EXPECT_EQ(results[2].problem, "embedded null byte");
  EXPECT_EQ(results[3].problem, "said before");
  EXPECT_EQ(results[4].problem, "");
  EXPECT_EQ(results[4].table.size(), 1u);
}

TEST_F(Files, InAnotherEncodingAreDecodedByTheHost) {
  const std::vector<BatchInput> inputs = {Source("a.py", "# coding: latin-1\nx = '\xE9'\n"),
                                          Source("b.py", "# coding: no-such\n"), Source("c.py", "x\n")};
  EXPECT_EQ(ResultsOf(Options(), inputs)[0].problem, "the source names an encoding that only a host can decode");
  BatchAnalyzer::Options options = Options();
  options.decode = [](Text bytes, std::string& utf8) {
    utf8 = bytes.find("latin-1") != Text::npos ? "x = '\xC3\xA9'\n" : "unknown";
    return bytes.find("latin-1") != Text::npos;
  };
  const std::vector<BatchResult> results = ResultsOf(std::move(options), inputs);
  EXPECT_EQ(results[0].table.DetailAt(1), "str: '\xC3\xA9'");
  EXPECT_EQ(results[1].problem, "unknown");
  EXPECT_EQ(results[2].table.size(), 1u);
}

TEST(Encodings, AreNamedInOneOfTheFirstTwoLines) {
  for (const Text source : {"# coding: latin-1\n", "#!/bin/x\n# -*- coding: cp1252 -*-\n",
                            "\n\t\f# vim: set fileencoding=utf-16 :", "# coding=\t koi8-r", "# coding: , coding: big5",
                            "\xFF\xFEx", "\r# coding: ascii\r"})
    EXPECT_TRUE(NeedsHostDecoding(source)) << source;
  for (const Text source : {"", "x", "# coding: utf-8\n", "# coding: UTF_8\n", "# coding: utf8\n",
                            "# coding: utf-8-sig", "x\n# coding: latin-1\n", "\n\n# coding: latin-1\n",
                            "x = 'coding: latin-1'\n", "\xEF\xBB\xBF# coding: latin-1\n", "# coding:\n",
                            "# encoding latin-1\n", "# coding: utf-8\n# coding: latin-1\n"})
    EXPECT_FALSE(NeedsHostDecoding(source)) << source;
}

// ---- what is told of the analysis itself ----

TEST(Reports, StayWithTheFileInWhichTheyArose) {
  std::string deep = "y\nx = ";
  for (int i = 0; i < 20'000; ++i) deep += "a + ";
  deep += "a\n";
  std::vector<BatchInput> inputs;
  for (int i = 0; i < 20; ++i) inputs.push_back(Source("a.py", i % 4 == 1 ? deep : "x = 1\n"));
  const testing::ConsoleCapture process;
  const std::vector<BatchResult> results = ResultsOf(Options(4), std::move(inputs));
  for (size_t i = 0; i < results.size(); ++i) {
    EXPECT_EQ(results[i].reports.empty(), i % 4 != 1) << i;
    for (const BatchResult::Message& report : results[i].reports) EXPECT_EQ(report.line, 2u);
  }
  EXPECT_TRUE(testing::ConsoleCapture::PrintedLines().empty());
  EXPECT_TRUE(testing::ReportedErrors().empty());
}

TEST(Reports, AnAnalyzerThatCannotBeBuiltIsToldWithEveryFile) {
  BatchAnalyzer::Options options = Options(2);
  options.analyzer.grammar_file = "/no/such/grammar";
  const std::vector<BatchResult> results = ResultsOf(std::move(options), ManySources(3));
  ASSERT_EQ(results.size(), 3u);
  for (const BatchResult& result : results) EXPECT_NE(result.problem.find("/no/such/grammar"), std::string::npos);
}

// ---- formats ----

std::string Written(std::unique_ptr<FileWriter> (*make)(), std::string path, std::string source) {
  BatchAnalyzer::Options options = Options(1);
  options.make_writer = make;
  return ResultsOf(std::move(options), {Source(std::move(path), std::move(source))}).at(0).output;
}
std::string Json(std::string source, std::string path = "a.py") {
  return Written([] { return MakeJsonLinesWriter({}); }, std::move(path), std::move(source));
}
std::string PlainText(std::string source, std::string path = "a.py") {
  return Written([] { return MakeTextLinesWriter({}); }, std::move(path), std::move(source));
}

TEST(Formats, AJsonStringHoldsAnyBytes) {
  const auto quoted = [](Text text) {
    std::string out;
    AppendJsonString(text, out);
    return out;
  };
  EXPECT_EQ(quoted(Text("a\"\\\n\r\t\f\b\0\x1f\x7f z", 13)), "\"a\\\"\\\\\\n\\r\\t\\f\\b\\u0000\\u001f\\u007f z\"");
  EXPECT_EQ(quoted("\xC3\xA9\xE6\xBC\xA2\xF0\x9F\x98\x80"), "\"\\u00e9\\u6f22\\ud83d\\ude00\"");
  EXPECT_EQ(quoted("\xFF\xC3"), "\"\\udcff\\udcc3\"");
}

TEST(Formats, AJsonLineCarriesEachRecordsPlaceAndScope) {
  EXPECT_EQ(
      Json("def f(a): pass\n", "a\n\xFF.py"),
      "{\"type\":\"line\",\"path\":\"a\\n\\udcff.py\",\"first_line\":1,\"last_line\":1,\"indent\":0,\"kind\":\"def\","
      "\"in_async_def\":false,\"first_in_def\":false,\"records\":["
      "{\"name\":\"f\",\"kind\":\"set\",\"detail\":\"\",\"is_parameter\":false,\"line\":1,\"column\":5,\"scope\":\"\"},"
      "{\"name\":\"a\",\"kind\":\"set\",\"detail\":\"\",\"is_parameter\":true,\"line\":1,\"column\":7,\"scope\":\"f\"}"
      "]}\n");
}

TEST(Formats, AnErrorIsAJsonLineOfItsOwn) {
  EXPECT_NE(Json("x = 1\ny = = 2\n")
                .find("\"records\":[],\"error\":{\"message\":\"invalid syntax\",\"line\":2,\"column\":5}}\n"),
            std::string::npos);
}

TEST(Formats, TextIsSafeToShow) {
  EXPECT_EQ(PlainText("x = '\x1b'\n", "a\n\xFF.py"),
            "a\\n\\udcff.py:1: x = '\\x1b'\n    x                   set\n    x                   = '\\x1b' (str)\n");
  EXPECT_EQ(PlainText("\ty = = \xE2\x80\xAE\n"), "a.py:1:6: invalid syntax\n    \ty = = \\u202e\n    \t    ^\n");
  EXPECT_EQ(PlainText("y = ="), "a.py:1:5: invalid syntax\n    y = =\n        ^\n");
}

TEST(Formats, WhatIsNoUtf8IsReplacedByTheLongestBeginningOfACharacter) {
  const auto shown = [](const std::string& bytes) {
    const std::string text = PlainText("y = = " + bytes + "|\n");
    const size_t begin = text.find("= = ") + 4;
    return text.substr(begin, text.find('|', begin) - begin);
  };
  const std::string one = "\xEF\xBF\xBD";
  for (const char* bytes : {"\xF0\x9F\x98", "\xF4\x8F\xBF", "\xE6\xBC", "\xED\x9F", "\xFF"})
    EXPECT_EQ(shown(bytes), one);
  EXPECT_EQ(shown("\xF4\x90"), one + one);
  EXPECT_EQ(shown("\xED\xA0\x80"), one + one + one);
  EXPECT_EQ(shown("\xE0\x9F"), one + one);
  EXPECT_EQ(shown("\xF0\x8F\xBF"), one + one + one);
}

TEST(Formats, ManyStatementsOnALongLineTakeLinearTime) {
  std::string source;
  for (int i = 0; i < 50'000; ++i) source += "x;";
  const std::string text = PlainText(source + "\n");
  EXPECT_LT(text.size(), 50'000u * 600);
}

// ---- columns ----

class OneSource : public RecordSource {
 public:
  explicit OneSource(std::vector<BatchInput> inputs) : batch_(Options(2), std::move(inputs)) {}
  bool Next(BatchResult& result) override { return batch_.Next(result); }
  const std::vector<BatchInput>& inputs() const override { return batch_.inputs(); }

 private:
  BatchAnalyzer batch_;
};

TEST(Columns, HoldTheRecordsOfAllFiles) {
  ArrowArrayStream stream;
  ExportRecordStream(std::make_unique<OneSource>(std::vector<BatchInput>{
                         Source("a.py", "x\n"), {"gone", {}, "problem"}, Source("b\xFF.py", "def f(yy): pass\n")}),
                     &stream);
  ArrowSchema schema;
  ASSERT_EQ(stream.get_schema(&stream, &schema), 0);
  ASSERT_EQ(schema.n_children, 8);
  EXPECT_STREQ(schema.children[4]->name, "name");
  for (int64_t i = 0; i < schema.n_children; ++i)
    EXPECT_EQ(schema.children[i]->dictionary != nullptr, i == 0 || i == 5) << schema.children[i]->name;
  schema.release(&schema);
  EXPECT_EQ(schema.release, nullptr);

  ArrowArray array;
  ASSERT_EQ(stream.get_next(&stream, &array), 0);
  ASSERT_EQ(array.length, 3);
  const auto text_at = [](const ArrowArray* column, int64_t i) {
    const auto* offsets = static_cast<const int64_t*>(column->buffers[1]);
    return Text(static_cast<const char*>(column->buffers[2]) + offsets[i],
                static_cast<size_t>(offsets[i + 1] - offsets[i]));
  };
  EXPECT_EQ(text_at(array.children[4], 2), "yy");
  const auto* paths = static_cast<const int32_t*>(array.children[0]->buffers[1]);
  EXPECT_EQ(text_at(array.children[0]->dictionary, paths[2]), "b\\xff.py");
  EXPECT_EQ(array.children[0]->dictionary->length, 3);
  EXPECT_EQ(text_at(array.children[3], 2), "f");
  EXPECT_EQ(static_cast<const uint8_t*>(array.children[7]->buffers[1])[0], 4);

  // A column that a reader moved away lives on its own.
  ArrowArray moved = *array.children[4];
  array.children[4]->release = nullptr;
  array.release(&array);
  stream.release(&stream);
  EXPECT_EQ(text_at(&moved, 0), "x");
  moved.release(&moved);
}

TEST(Columns, OfOccurrencesHaveDictionariesWhereWordsRepeat) {
  ArrowArrayStream stream;
  ExportOccurrenceStream(std::make_unique<OneSource>(std::vector<BatchInput>{}), &stream);
  ArrowSchema schema;
  ASSERT_EQ(stream.get_schema(&stream, &schema), 0);
  Strings with_dictionary, that_may_be_null;
  for (int64_t i = 0; i < schema.n_children; ++i) {
    if (schema.children[i]->dictionary != nullptr) with_dictionary.emplace_back(schema.children[i]->name);
    if (schema.children[i]->flags != 0) that_may_be_null.emplace_back(schema.children[i]->name);
  }
  EXPECT_EQ(with_dictionary, (Strings{"path", "role", "kind"}));
  EXPECT_EQ(that_may_be_null, (Strings{"kind", "receiver", "symbol", "symbol_name"}));
  schema.release(&schema);
  stream.release(&stream);
}

TEST(Columns, HaveTheSameDictionariesInAllBatches) {
  std::vector<BatchInput> inputs;
  std::string source;
  for (int i = 0; i < 20'000; ++i) source += "name = call(value)\n";
  for (const char* path : {"a.py", "b.py", "a.py"}) inputs.push_back(Source(path, source));
  ArrowArrayStream stream;
  ExportRecordStream(std::make_unique<OneSource>(std::move(inputs)), &stream);
  std::vector<int32_t> first_paths;
  for (ArrowArray array;; array.release(&array)) {
    ASSERT_EQ(stream.get_next(&stream, &array), 0);
    if (array.release == nullptr) break;
    const ArrowArray* dictionary = array.children[0]->dictionary;
    ASSERT_EQ(dictionary->length, 2);
    EXPECT_EQ(Text(static_cast<const char*>(dictionary->buffers[2]), 8), "a.pyb.py");
    first_paths.push_back(static_cast<const int32_t*>(array.children[0]->buffers[1])[0]);
  }
  EXPECT_EQ(first_paths, (std::vector<int32_t>{0, 1, 0}));
  stream.release(&stream);
}

TEST(Columns, TakeBackBitsThatWereAdded) {
  for (const size_t kept : {0u, 1u, 7u, 8u, 9u, 30u}) {
    Bits bits;
    for (size_t i = 0; i < 30; ++i) bits.Add(i % 3 != 0);
    bits.Truncate(kept);
    EXPECT_EQ(bits.size(), kept);
    EXPECT_EQ(bits.false_count(), (kept + 2) / 3);
    bits.Add(false);
    bits.Add(true, 20);
    ASSERT_EQ(bits.size(), kept + 21);
    EXPECT_EQ(bits.false_count(), (kept + 2) / 3 + 1);
    for (size_t i = 0; i < kept + 21; ++i) EXPECT_EQ(bits[i], i < kept ? i % 3 != 0 : i > kept) << kept << " " << i;
  }
}

TEST(Columns, EndWithoutABatch) {
  ArrowArrayStream stream;
  ExportRecordStream(std::make_unique<OneSource>(std::vector<BatchInput>{}), &stream);
  ArrowArray array;
  ASSERT_EQ(stream.get_next(&stream, &array), 0);
  EXPECT_EQ(array.release, nullptr);
  EXPECT_EQ(stream.get_last_error(&stream), nullptr);
  stream.release(&stream);
}

TEST(Batch, TheOldPrintStatementIsReadAsItsVersionReadsIt) {
  EXPECT_EQ(RecordsOf("print x\n", kNoText, kPy2), (Strings{"1:7 |x get"}));
}

}  // namespace
}  // namespace quillet
