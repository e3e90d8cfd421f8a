// What each stage costs, over a corpus held in memory (see corpus.h), on one core:
// tokenising, cutting into logical lines, parsing with discard, walking (hints included), all of it, and
// binding names, alone and with all of it, and reading statements and expressions.
//
// `--passes exact 3`, or `complete`: nothing but so many analyses of all files, for `perf stat` or callgrind.
//
// Counters: ns per token, MB/s, physical lines/s. Before a stage is timed its result is checked: the
// tokens cover the source in order, trees come out the same twice, recycled nodes give the records
// that fresh ones give, a recycled binder and a recycled reader what fresh
// ones give.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "analysis/file_analyzer.h"
#include "bench/corpus.h"
#include "names/binder.h"
#include "names/scope_rules.h"
#include "syntax/reader.h"

namespace quillet::bench {
namespace {

constexpr Version kVersion{{3, 11, 0}, 3};

FileAnalyzer::Options AnalyzerOptions(bool reads_completely = false) {
  FileAnalyzer::Options options;
  options.reads_completely = reads_completely;
  if (reads_completely) options.make_name_rules = MakeScopeRules;
  options.version = kVersion;
  options.grammar_file = std::string(QUILLET_SOURCE_DIR "/resources/pgen-grammars/") + kPy3DefaultGrammar;
  options.hint_grammar_file = options.grammar_file;
  for (Text word : Py3Keywords()) options.keywords.emplace_back(word);
  options.hint_keywords = options.keywords;
  return options;
}

void Require(bool condition, const char* what) {
  if (condition) return;
  std::fprintf(stderr, "not timed, the result is wrong: %s\n", what);
  std::exit(1);
}

// The corpus cut into lines, ready for the later stages.
struct CutFile {
  Ref<SourceText> source;
  std::vector<LineRow> rows;
};

const std::vector<CutFile>& CutCorpus() {
  static const std::vector<CutFile> files = [] {
    std::vector<CutFile> result;
    for (const std::string& bytes : TheCorpus().files) {
      CutFile file{SourceText::Copy(bytes), {}};
      CutLines(*file.source, kVersion, file.rows);
      result.push_back(std::move(file));
    }
    return result;
  }();
  return files;
}

size_t TokenCount() {
  static const size_t count = [] {
    size_t sum = 0;
    for (const CutFile& file : CutCorpus()) sum += file.source->tokens.size();
    return sum;
  }();
  return count;
}

void Report(benchmark::State& state) {
  const double passes = static_cast<double>(state.iterations());
  const double tokens = static_cast<double>(TokenCount());
  state.counters["ns/token"] =
      benchmark::Counter(tokens * passes / 1e9, benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
  state.counters["MB/s"] =
      benchmark::Counter(static_cast<double>(TheCorpus().bytes) * passes / 1e6, benchmark::Counter::kIsRate);
  state.counters["lines/s"] =
      benchmark::Counter(static_cast<double>(TheCorpus().lines) * passes, benchmark::Counter::kIsRate);
}

bool TokensInOrder(const SourceText& source) {
  const char* at = source.begin();
  for (const Token& token : source.tokens) {
    if (token.text < at || token.end() > source.end() || token.length == 0) return false;
    at = token.end();
  }
  return true;
}

void Tokenize(benchmark::State& state) {
  Ref<SourceText> source = SourceText::Copy(Text(""));
  for (const std::string& bytes : TheCorpus().files) {
    source->Assign(bytes);
    TokenizeOnly(*source, kVersion);
    Require(TokensInOrder(*source), "tokens are not in the order of the source");
  }
  for (auto _ : state) {
    for (const std::string& bytes : TheCorpus().files) {
      source->Assign(bytes);
      TokenizeOnly(*source, kVersion);
      benchmark::DoNotOptimize(source->tokens.data());
    }
  }
  Report(state);
}
BENCHMARK(Tokenize)->Unit(benchmark::kMillisecond);

void Cut(benchmark::State& state) {
  Ref<SourceText> source = SourceText::Copy(Text(""));
  std::vector<LineRow> rows;
  size_t index = 0;
  for (const std::string& bytes : TheCorpus().files) {
    source->Assign(bytes);
    rows.clear();
    CutLines(*source, kVersion, rows);
    Require(rows.size() == CutCorpus()[index].rows.size(), "a source is not cut the same way twice");
    ++index;
  }
  for (auto _ : state) {
    for (const std::string& bytes : TheCorpus().files) {
      source->Assign(bytes);
      rows.clear();
      CutLines(*source, kVersion, rows);
      benchmark::DoNotOptimize(rows.data());
    }
  }
  Report(state);
}
BENCHMARK(Cut)->Unit(benchmark::kMillisecond);

// Calls visit(line, tree) for every line of a file that parses to a tree; the tree is discarded.
// Gives the number of lines that do not parse.
template <class Visit>
size_t ParseFile(CPGenParserImpl& parser, const CutFile& file, Visit&& visit) {
  size_t errors = 0;
  LogicalLine line;
  for (const LineRow& row : file.rows) {
    if (row.token_count == 0 || row.kind == LineKind::kComment) continue;
    SetFromRow(line, file.source, row);
    try {
      CNode* node = parser.ParseToNode(line, false);
      if (node == nullptr) continue;
      visit(line, node);
      parser.DiscardNode(node);
    } catch (const ParseError&) {
      ++errors;
    }
  }
  return errors;
}

template <class Visit>
size_t ParseCorpus(CPGenParserImpl& parser, Visit&& visit) {
  size_t errors = 0;
  for (const CutFile& file : CutCorpus()) errors += ParseFile(parser, file, visit);
  return errors;
}

size_t CountNodes(const CNode* node) {
  size_t count = 1;
  for (const CNode* child : node->fChildren()) count += CountNodes(child);
  return count;
}

void ParseWithDiscard(benchmark::State& state) {
  CPGenAnalyzerImpl analyzer(AnalyzerOptions());
  CPGenParserImpl& parser = analyzer.logical_parser();
  size_t first = 0, second = 0;
  const size_t errors = ParseCorpus(parser, [&](LogicalLine&, CNode* node) { first += CountNodes(node); });
  ParseCorpus(parser, [&](LogicalLine&, CNode* node) { second += CountNodes(node); });
  Require(first == second && first > 0, "recycled nodes make other trees");
  for (auto _ : state) ParseCorpus(parser, [](LogicalLine&, CNode*) {});
  state.counters["rejected"] = static_cast<double>(errors);
  Report(state);
}
BENCHMARK(ParseWithDiscard)->Unit(benchmark::kMillisecond);

// The walk alone, on trees that are as warm as they are in use: what parsing, walking and discarding
// a file's lines takes, less what parsing and discarding them takes.
void WalkCorpus(benchmark::State& state, bool with_hints) {
  CPGenAnalyzerImpl analyzer(AnalyzerOptions());
  CPGenParserImpl& parser = analyzer.logical_parser();
  RecordStore store;
  size_t records = 0, rejected = 0;
  const auto walk = [&](LogicalLine& line, CNode* node) {
    line.WriteTo(&store);
    try {
      analyzer.node_walker().Walk(node, &line);
      if (with_hints) analyzer.type_hint_walker().Walk(node, &line, false);
    } catch (const Error&) {
      ++rejected;
    }
  };
  const auto nothing = [](LogicalLine&, CNode*) {};
  const auto seconds_of = [&](const CutFile& file, const auto& visit) {
    const auto start = std::chrono::steady_clock::now();
    ParseFile(parser, file, visit);
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  };
  for (auto _ : state) {
    double seconds = 0;
    records = rejected = 0;
    for (const CutFile& file : CutCorpus()) {
      store.Reset();
      seconds -= seconds_of(file, nothing);
      seconds += seconds_of(file, walk);
      records += store.rows.size() + store.arg_rows.size();
    }
    state.SetIterationTime(seconds);
  }
  Require(records > 0, "no records");
  state.counters["records"] = static_cast<double>(records);
  state.counters["rejected"] = static_cast<double>(rejected);
  Report(state);
}
void Walk(benchmark::State& state) { WalkCorpus(state, true); }
BENCHMARK(Walk)->Unit(benchmark::kMillisecond)->UseManualTime();

// What is left of it without the search for hints: nearly no statement has a type comment, so the
// difference is the price of looking for them and for annotations.
void WalkWithoutHints(benchmark::State& state) { WalkCorpus(state, false); }
BENCHMARK(WalkWithoutHints)->Unit(benchmark::kMillisecond)->UseManualTime();

uint64_t Fingerprint(const FileAnalyzer& files) {
  uint64_t hash = 1469598103934665603u;
  const auto add = [&hash](Text text) {
    for (char byte : text) hash = (hash ^ static_cast<uint8_t>(byte)) * 1099511628211u;
    hash *= 31;
  };
  for (const auto* rows : {&files.store().rows, &files.store().arg_rows}) {
    for (const Record& record : *rows) {
      add(record.name());
      add(record.info());
    }
  }
  return hash;
}

void AnalyzeCorpus(benchmark::State& state, bool reads_completely) {
  FileAnalyzer recycled(AnalyzerOptions(reads_completely));
  for (size_t i = 0; i < TheCorpus().files.size(); ++i) {
    recycled.Analyze(TheCorpus().files[i]);
    FileAnalyzer fresh(AnalyzerOptions(reads_completely));
    fresh.Analyze(TheCorpus().files[i]);
    Require(Fingerprint(fresh) == Fingerprint(recycled), "recycled nodes give other records");
  }
  size_t records = 0, errors = 0;
  for (auto _ : state) {
    records = errors = 0;
    for (const std::string& bytes : TheCorpus().files) {
      recycled.Analyze(bytes);
      records += recycled.store().rows.size() + recycled.store().arg_rows.size();
      errors += recycled.errors().size();
    }
  }
  state.counters["records"] = static_cast<double>(records);
  state.counters["rejected"] = static_cast<double>(errors);
  Report(state);
}
void BytesToRecords(benchmark::State& state) { AnalyzeCorpus(state, false); }
BENCHMARK(BytesToRecords)->Unit(benchmark::kMillisecond);

// As the version has it: what the tables cannot judge is looked for and read again.
void BytesToRecordsCompletely(benchmark::State& state) { AnalyzeCorpus(state, true); }
BENCHMARK(BytesToRecordsCompletely)->Unit(benchmark::kMillisecond);

// Nothing but the analysis, for what counts all that a process does: two numbers of passes tell what one costs.
int Pass(Text reading, const char* count) {
  if (reading != "exact" && reading != "complete") return 2;
  FileAnalyzer analyzer(AnalyzerOptions(reading == "complete"));
  for (int passes = std::atoi(count); passes > 0; --passes)
    for (const std::string& bytes : TheCorpus().files) analyzer.Analyze(bytes);
  return 0;
}

bool SameNames(const Bindings& a, const Bindings& b) {
  if (a.occurrences.size() != b.occurrences.size() || a.symbols.size() != b.symbols.size()) return false;
  for (size_t i = 0; i < a.occurrences.size(); ++i) {
    const Occurrence& left = a.occurrences[i];
    const Occurrence& right = b.occurrences[i];
    if (left.begin != right.begin || left.role != right.role || a.VariableOf(left) != b.VariableOf(right)) return false;
    if (a.TextOf(left) != b.TextOf(right)) return false;
  }
  return true;
}

// Binds the names of a file that was cut.
void Names(benchmark::State& state) {
  NameBinder recycled(kVersion);
  size_t occurrences = 0, symbols = 0, bytes = 0;
  for (const CutFile& file : CutCorpus()) {
    NameBinder fresh(kVersion);
    Require(SameNames(recycled.Bind(*file.source, file.rows), fresh.Bind(*file.source, file.rows)),
            "a recycled binder gives other names");
    const Bindings held = recycled.Bind(*file.source, file.rows);
    occurrences += held.occurrences.size();
    symbols += held.symbols.size();
    bytes += held.ByteSize();
  }
  for (auto _ : state) {
    for (const CutFile& file : CutCorpus())
      benchmark::DoNotOptimize(recycled.Bind(*file.source, file.rows).occurrences.data());
  }
  state.counters["occurrences"] = static_cast<double>(occurrences);
  state.counters["symbols"] = static_cast<double>(symbols);
  state.counters["bytes/occurrence"] = static_cast<double>(bytes) / static_cast<double>(occurrences);
  Report(state);
}
BENCHMARK(Names)->Unit(benchmark::kMillisecond);

// Both, as a file is analysed with its names; to be held against BytesToRecords.
void BytesToRecordsAndNames(benchmark::State& state) {
  FileAnalyzer analyzer(AnalyzerOptions());
  NameBinder binder(kVersion);
  for (auto _ : state) {
    for (const std::string& bytes : TheCorpus().files) {
      analyzer.Analyze(bytes);
      const Bindings held = binder.Bind(analyzer.source(), analyzer.rows());
      benchmark::DoNotOptimize(held.occurrences.data());
    }
  }
  Report(state);
}
BENCHMARK(BytesToRecordsAndNames)->Unit(benchmark::kMillisecond);

bool IsSameSyntax(const FileSyntax& a, const FileSyntax& b) {
  if (a.exprs.size() != b.exprs.size() || a.stmts.size() != b.stmts.size() || a.lists != b.lists) return false;
  for (size_t i = 0; i < a.exprs.size(); ++i) {
    const Expr& left = a.exprs[i];
    const Expr& right = b.exprs[i];
    if (left.kind != right.kind || left.begin != right.begin || left.end != right.end || left.parent != right.parent)
      return false;
  }
  return true;
}

// Reads the statements and expressions of a file that was cut.
void Syntax(benchmark::State& state) {
  SyntaxReader recycled(kVersion);
  FileSyntax file;
  size_t exprs = 0, stmts = 0;
  for (const CutFile& cut : CutCorpus()) {
    FileSyntax fresh;
    SyntaxReader(kVersion).Read(*cut.source, cut.rows, fresh);
    recycled.Read(*cut.source, cut.rows, file);
    Require(IsSameSyntax(file, fresh), "a recycled reader says otherwise");
    exprs += file.exprs.size();
    stmts += file.stmts.size();
  }
  for (auto _ : state) {
    for (const CutFile& cut : CutCorpus()) {
      recycled.Read(*cut.source, cut.rows, file);
      benchmark::DoNotOptimize(file.exprs.data());
    }
  }
  state.counters["expressions"] = static_cast<double>(exprs);
  state.counters["statements"] = static_cast<double>(stmts);
  Report(state);
}
BENCHMARK(Syntax)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace quillet::bench

int main(int argc, char** argv) {
  if (argc == 4 && std::string(argv[1]) == "--passes") return quillet::bench::Pass(argv[2], argv[3]);
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  const auto& corpus = quillet::bench::TheCorpus();
  std::printf("corpus: %s, %zu files, %.1f MB, %zu lines, %zu tokens\n", corpus.folder.c_str(), corpus.files.size(),
              static_cast<double>(corpus.bytes) / 1e6, corpus.lines, quillet::bench::TokenCount());
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
