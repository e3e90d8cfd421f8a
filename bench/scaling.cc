// quillet_scaling: whether the time and the memory that an analysis takes grow as its input does.
//
// Inputs are made to do harm: one text that repeats (nested, left open, cut apart in the middle), at a
// size and at four times that size. Each is analysed as 3.12 and as 2.7, cut into records and written in
// each format and as an index's words, in a process of its own, on a thread with a small stack. What costs more a byte
// at the larger size, costs more than any honest input does, or ends the process, is named; exit code 1 then. The last
// phases make the tree and the text of each statement, and the lines embedded in it; the statements and expressions of
// all of it at once; the occurrences of its names; and the answers of a workspace of this file alone, asked at places
// from its beginning to its end.
//
//   quillet_scaling                     the list below
//   quillet_scaling --pairs             all pairs of fragments, repeated
//   quillet_scaling --random N [SEED]   N random sequences of fragments, repeated, half of them behind a front
//   --count N                           each unit of the list N times, once: whether it ends, whatever it costs
//   --phases NAME,...                   these columns alone (output needs 3.12)
//   --slow SECONDS                      names the questions to a workspace that take longer
//   --seconds N                         ends an input of a count behind so many
//   --write PATH                        writes the input that --only names, at a count, and measures nothing
//   --size KIB, --stack KIB, --only TEXT, --list
//
// Time is that of the processor. It is taken again where it looks bad, since other processes disturb it.
#include <pthread.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fstream>
#include <functional>
#include <random>
#include <string>
#include <vector>

#include "foundations/console.h"
#include "index/words.h"
#include "names/binder.h"
#include "output/json_lines.h"
#include "output/text_lines.h"
#include "syntax/reader.h"
#include "tests/core/support/shapes.h"
#include "tests/core/support/small_library.h"
#include "workspace/questions.h"

namespace quillet::bench {
namespace {

using testing::Fragments;
using testing::Make;
using testing::Shape;
using testing::Shapes;

size_t CountFor(const Shape& shape, size_t size) {
  return std::max<size_t>(1, size / std::max<size_t>(1, shape.unit.size() + shape.back.size()));
}

std::string Shown(const std::string& text) {
  std::string shown;
  for (const char c : text) {
    if (c == '\n') {
      shown += "\\n";
    } else if (c >= ' ' && c < 0x7F) {
      shown += c;
    } else {
      char hex[8];
      std::snprintf(hex, sizeof hex, "\\x%02x", static_cast<unsigned char>(c));
      shown += hex;
    }
  }
  return shown;
}

// ---- one measurement, in a process of its own ----

constexpr int kPhases = 8;
constexpr const char* kPhaseNames[kPhases] = {"3.12", "2.7", "whole", "output", "text", "syntax", "names", "asked"};

struct Costs {
  double seconds[kPhases][2];
  double bytes[2];   // of the texts
  double memory[2];  // by which the process grew for one
  bool refused;      // the larger one: it takes more memory than a source may
};

FileAnalyzer::Options OptionsFor(bool py3, bool reads_completely = false) {
  const std::string folder = QUILLET_SOURCE_DIR "/resources/pgen-grammars/";
  FileAnalyzer::Options options;
  options.version = py3 ? Version::Of(3, 12) : Version::Of(2, 7);
  options.py3_grammar = py3;
  options.reads_completely = reads_completely;
  options.grammar_file = folder + (py3 ? kPy3DefaultGrammar : kPy2DefaultGrammar);
  options.hint_grammar_file = folder + kPy3DefaultGrammar;
  for (const Text keyword : py3 ? Py3Keywords() : Py27Keywords()) options.keywords.emplace_back(keyword);
  for (const Text keyword : Py3Keywords()) options.hint_keywords.emplace_back(keyword);
  return options;
}

double ProcessorSeconds() {
  timespec now;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

double PeakBytes() {
  rusage usage;
  getrusage(RUSAGE_SELF, &usage);
  return static_cast<double>(usage.ru_maxrss) * 1024;
}

// Built once, in front of the first measurement, and inherited by the processes.
struct Tools {
  FileAnalyzer py3{OptionsFor(true)};
  FileAnalyzer py2{OptionsFor(false)};
  FileAnalyzer whole{OptionsFor(true, true)};
  std::unique_ptr<FileWriter> json = MakeJsonLinesWriter({});
  std::unique_ptr<FileWriter> text = MakeTextLinesWriter({});
  std::unique_ptr<FileWriter> words = MakeWordsWriter(Version::Of(3, 12));
  RecordTableMaker tables;
  CPGenAnalyzerImpl analyzer{OptionsFor(true)};
};

Tools& TheTools() {
  static Tools tools;
  return tools;
}

// Whether something takes more memory than a source may.
bool IsRefused(const std::function<void()>& work) {
  try {
    work();
  } catch (const Error& error) {
    if (error.kind() != ErrorKind::kOverflowError) throw;
    return true;
  }
  return false;
}

void WriteAll(const FileAnalyzer& file) {
  Tools& tools = TheTools();
  ScopeNames scopes;
  scopes.Build(file);
  PlacedRecords placed;
  BatchInput input;
  input.path = "x.py";
  {
    std::string out;
    tools.json->Write(input, file, scopes, placed, out);
  }
  {
    std::string out;
    tools.text->Write(input, file, scopes, placed, out);
  }
  {
    std::string out;
    tools.words->Write(input, file, scopes, placed, out);
  }
  (void)tools.tables.Make(file, scopes, placed);
}

// Trees, embedded lines and texts by themselves, as a host asks for them.
void RenderAll(Text text) {
  CPGenParserImpl& parser = TheTools().analyzer.logical_parser();
  CNodeToTextConverter converter(true, true, true);
  const Ref<SourceText> source = SourceText::Copy(text);
  std::vector<LineRow> rows;
  CutLines(*source, Version::Of(3, 12), rows);
  for (const LineRow& row : rows) {
    LogicalLine line;
    SetFromRow(line, source, row);
    CNode* node = nullptr;
    try {
      (void)line.GetExpLogicals();
      node = parser.ParseToNode(line, true);
      if (node != nullptr) (void)converter.TextForNode(node);
    } catch (const Error&) {
    }
    if (node != nullptr) parser.DiscardNode(node);
  }
}

void ReadSyntax(Text text) {
  const Ref<SourceText> source = SourceText::Copy(text);
  for (const Version version : {Version::Of(3, 12), Version::Of(2, 7)}) {
    std::vector<LineRow> rows;
    CutLines(*source, version, rows);
    FileSyntax file;
    SyntaxReader(version).Read(*source, rows, file);
    for (uint32_t place = 0; place < text.size(); place += static_cast<uint32_t>(text.size() / 8 + 1))
      (void)file.StatementAt(place);
  }
}

void BindNames(Text text) {
  for (const Version version : {Version::Of(3, 12), Version::Of(2, 7)}) NameBinder(version).Bind(text);
}

// Questions that take longer are named on standard error; 0 for none of them.
double g_slow_seconds = 0;

void Ask(Text text) {
  constexpr uint32_t kPlaces = 4;
  Workspace::Settings settings;
  settings.roots = {"/nowhere"};
  settings.version = Version::Of(3, 12);
  settings.typeshed = testing::SmallLibrary();
  Workspace workspace(std::move(settings));
  const auto timed = [](const char* name, uint32_t at, const auto& question) {
    const double begin = ProcessorSeconds();
    (void)question();
    const double seconds = ProcessorSeconds() - begin;
    if (g_slow_seconds > 0 && seconds > g_slow_seconds) std::fprintf(stderr, "  %s at %u: %.2f s\n", name, at, seconds);
  };
  const FileId file = workspace.FileOf("/nowhere/a.py");
  timed("Open", 0, [&] {
    workspace.Open(file, std::string(text));
    return workspace.CanRead(file);
  });
  for (uint32_t i = 0; i <= kPlaces; ++i) {
    const auto place = static_cast<uint32_t>(text.size() * i / kPlaces);
    for (const uint32_t at : {place, place == 0 ? 0 : place - 1}) {
      timed("Definitions", at, [&] { return workspace.Definitions(file, at); });
      timed("TypeDefinitions", at, [&] { return workspace.TypeDefinitions(file, at); });
      timed("Declarations", at, [&] { return workspace.Declarations(file, at); });
      timed("Implementations", at, [&] { return workspace.Implementations(file, at); });
      timed("References", at, [&] { return workspace.References(file, at); });
      timed("Types", at, [&] { return workspace.Types(file, at); });
      timed("HoverAt", at, [&] { return workspace.HoverAt(file, at); });
      timed("Signatures", at, [&] { return workspace.Signatures(file, at); });
      timed("Complete", at, [&] { return workspace.Complete(file, at); });
      timed("Callers", at, [&] { return workspace.Callers(file, at); });
      timed("Callees", at, [&] { return workspace.Callees(file, at); });
      timed("Supertypes", at, [&] { return workspace.Supertypes(file, at); });
      timed("Selections", at, [&] { return workspace.Selections(file, at); });
      timed("RenameTo", at, [&] { return workspace.RenameTo(file, at, "renamed"); });
    }
  }
  timed("Outline", 0, [&] { return workspace.Outline(file); });
  timed("Problems", 0, [&] { return workspace.Problems(file); });
  timed("Folds", 0, [&] { return workspace.Folds(file); });
  timed("Colours", 0, [&] { return workspace.Colours(file); });
  timed("Hints", 0, [&] { return workspace.Hints(file); });
  timed("Symbols", 0, [&] { return workspace.Symbols("a"); });
}

// One measurement at a count, or two: at that of a size and of four times that size.
struct Amount {
  size_t size;
  size_t count;           // 0 stands for that of the size
  uint32_t phases = ~0u;  // bits by their numbers
};

Costs MeasureHere(const Shape& shape, Amount amount) {
  Costs costs{};
  Tools& tools = TheTools();
  const size_t counts[] = {amount.count != 0 ? amount.count : CountFor(shape, amount.size),
                           CountFor(shape, 4 * amount.size)};
  const int rounds = amount.count != 0 ? 1 : 2;
  for (int step = 0; step < rounds; ++step) {
    const std::string text = Make(shape, counts[step]);
    costs.bytes[step] = static_cast<double>(text.size());
    const double memory = PeakBytes();
    // The second time round memory is there.
    for (int round = 0; round < rounds; ++round) {
      bool is_analysed = false;
      const std::function<void()> phases[kPhases] = {
          [&] {
            tools.py3.Analyze(text);
            is_analysed = true;
          },
          [&] { tools.py2.Analyze(text); },
          [&] { tools.whole.Analyze(text); },
          [&] {
            if (is_analysed) WriteAll(tools.py3);
          },
          [&] { RenderAll(text); },
          [&] { ReadSyntax(text); },
          [&] { BindNames(text); },
          [&] { Ask(text); },
      };
      for (int phase = 0; phase < kPhases; ++phase) {
        if ((amount.phases >> phase & 1) == 0) continue;
        const double begin = ProcessorSeconds();
        costs.refused |= IsRefused(phases[phase]);
        costs.seconds[phase][step] = ProcessorSeconds() - begin;
      }
    }
    costs.memory[step] = PeakBytes() - memory;
  }
  return costs;
}

struct Job {
  const Shape* shape;
  Amount amount;
  int pipe;
};

void* RunJob(void* argument) {
  const Job& job = *static_cast<Job*>(argument);
  Costs costs{};
  costs = MeasureHere(*job.shape, job.amount);
  if (write(job.pipe, &costs, sizeof costs) != sizeof costs) std::perror("write");
  return nullptr;
}

unsigned g_most_seconds = 1800;  // for a count

// Empty, or what became of the process.
std::string Measure(const Shape& shape, Amount amount, size_t stack, Costs& costs) {
  int ends[2];
  if (pipe(ends) != 0) return "no pipe";
  const pid_t child = fork();
  if (child == 0) {
    close(ends[0]);
    if (amount.count != 0) alarm(g_most_seconds);
    Job job{&shape, amount, ends[1]};
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setstacksize(&attributes, stack);
    pthread_t thread;
    if (pthread_create(&thread, &attributes, RunJob, &job) != 0) _exit(3);
    pthread_join(thread, nullptr);
    _exit(0);
  }
  close(ends[1]);
  const bool has_costs = read(ends[0], &costs, sizeof costs) == sizeof costs;
  close(ends[0]);
  int status = 0;
  waitpid(child, &status, 0);
  if (WIFSIGNALED(status)) return std::string("killed: ") + strsignal(WTERMSIG(status));
  if (!has_costs) return "no result, exit code " + std::to_string(WEXITSTATUS(status));
  return {};
}

// ---- judging ----

struct Limits {
  Amount amount = {256 << 10, 0};
  size_t stack = 512 << 10;
  double growth = 2;          // of the cost of a byte, from a size to four times that size
  double least = 15;          // ns a byte: below it nothing but noise and caches make the growth
  double nanoseconds = 4000;  // of a byte
  double memory = 1000;       // bytes a byte
};

// What is wrong with the costs of a shape; empty where nothing is.
std::string Judge(const Costs& costs, const Limits& limits) {
  std::string wrong;
  if (limits.amount.count != 0) return wrong;
  char line[160];
  for (int phase = 0; phase < kPhases; ++phase) {
    const double small = costs.seconds[phase][0] / costs.bytes[0] * 1e9;
    const double large = costs.seconds[phase][1] / costs.bytes[1] * 1e9;
    if (large > limits.growth * std::max(small, limits.least) || large > limits.nanoseconds) {
      std::snprintf(line, sizeof line, " %s: %.0f -> %.0f ns a byte;", kPhaseNames[phase], small, large);
      wrong += line;
    }
  }
  const double memory = costs.memory[1] / costs.bytes[1];
  if (memory > limits.memory) {
    std::snprintf(line, sizeof line, " memory: %.0f bytes a byte;", memory);
    wrong += line;
  }
  return wrong;
}

// True where the shape is as it should be.
bool Try(const Shape& shape, const Limits& limits, bool show_all) {
  std::string wrong;
  Costs costs{};
  for (int attempt = 0; attempt < 3; ++attempt) {
    wrong = Measure(shape, limits.amount, limits.stack, costs);
    if (!wrong.empty() || costs.refused) break;
    wrong = Judge(costs, limits);
    if (wrong.empty()) break;
  }
  if (show_all || !wrong.empty()) {
    std::printf("%-44s", shape.name.c_str());
    const int last = limits.amount.count != 0 ? 0 : 1;
    const double bytes = std::max(costs.bytes[last], 1.0);
    for (int phase = 0; phase < kPhases; ++phase) std::printf(" %6.0f", costs.seconds[phase][last] / bytes * 1e9);
    std::printf(" %6.0f %s%s%s\n", costs.memory[last] / bytes, costs.refused ? "  refused: too large" : "",
                wrong.empty() ? "" : "  <--", wrong.c_str());
    std::fflush(stdout);
  }
  return wrong.empty();
}

int Main(int argc, char** argv) {
  Limits limits;
  bool pairs = false;
  size_t random_count = 0;
  unsigned seed = 1;
  std::string only, path;
  for (int i = 1; i < argc; ++i) {
    const std::string option = argv[i];
    const auto value = [&] { return i + 1 < argc ? std::strtoul(argv[++i], nullptr, 10) : 0; };
    if (option == "--pairs") {
      pairs = true;
    } else if (option == "--random") {
      random_count = value();
      if (i + 1 < argc && argv[i + 1][0] != '-') seed = static_cast<unsigned>(value());
    } else if (option == "--size") {
      limits.amount.size = value() << 10;
    } else if (option == "--count") {
      limits.amount.count = value();
    } else if (option == "--stack") {
      limits.stack = value() << 10;
    } else if (option == "--only" && i + 1 < argc) {
      only = argv[++i];
    } else if (option == "--write" && i + 1 < argc) {
      path = argv[++i];
    } else if (option == "--phases" && i + 1 < argc) {
      const std::string wanted = std::string(",") + argv[++i] + ",";
      limits.amount.phases = 0;
      for (int phase = 0; phase < kPhases; ++phase)
        if (wanted.find(std::string(",") + kPhaseNames[phase] + ",") != std::string::npos)
          limits.amount.phases |= 1u << phase;
    } else if (option == "--seconds") {
      g_most_seconds = static_cast<unsigned>(value());
    } else if (option == "--slow" && i + 1 < argc) {
      g_slow_seconds = std::strtod(argv[++i], nullptr);
    } else if (option == "--list") {
      for (const Shape& shape : Shapes()) std::printf("%-44s %s\n", shape.name.c_str(), Shown(shape.unit).c_str());
      return 0;
    } else {
      std::fprintf(stderr,
                   "usage: quillet_scaling [--pairs | --random N [SEED]] [--size KIB | --count N] [--stack KIB] "
                   "[--only TEXT] [--phases NAME,...] [--slow SECONDS] [--seconds N] [--write PATH] [--list]\n");
      return 2;
    }
  }
  if (!path.empty()) {
    const auto shape = std::ranges::find(Shapes(), only, &Shape::name);
    if (shape == Shapes().end()) return 2;
    std::ofstream(path, std::ios::binary) << Make(*shape, limits.amount.count);
    return 0;
  }
  TheConsole().print_line = [](Text) {};
  TheConsole().report_exception = [](const std::exception_ptr&, bool) {};
  TheTools();
  testing::SmallLibrary();

  size_t tried = 0, bad = 0;
  std::printf("%-44s", "input");
  for (const char* phase : kPhaseNames) std::printf(" %6s", phase);
  std::printf(" %6s\n", "memory");
  const auto run = [&](const Shape& shape, bool show_all) {
    ++tried;
    bad += !Try(shape, limits, show_all);
  };
  if (pairs) {
    for (const std::string& first : Fragments()) {
      for (const std::string& second : Fragments())
        run({Shown(first) + " " + Shown(second), "", first + second}, false);
    }
  } else if (random_count != 0) {
    std::mt19937 random(seed);
    const auto fragment = [&] { return Fragments()[random() % Fragments().size()]; };
    for (size_t i = 0; i < random_count; ++i) {
      Shape shape{"", "", ""};
      if (random() % 2) shape.front = fragment() + fragment();
      for (size_t left = 1 + random() % 5; left > 0; --left) shape.unit += fragment();
      shape.name = "(" + Shown(shape.front) + ") " + Shown(shape.unit);
      run(shape, false);
    }
  } else {
    for (const Shape& shape : Shapes()) {
      if (shape.name.find(only) != std::string::npos) run(shape, true);
    }
  }
  std::printf("%zu inputs, %zu of them bad (ns a byte by phase; bytes of memory a byte)\n", tried, bad);
  return bad == 0 ? 0 : 1;
}

}  // namespace
}  // namespace quillet::bench

int main(int argc, char** argv) { return quillet::bench::Main(argc, argv); }
