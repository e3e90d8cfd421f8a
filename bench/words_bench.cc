// What it costs to ask which files of a project hold a word: the first question, which reads all of them, those
// behind it, and to look whether anything changed. The project is the folder of the corpus (see corpus.h).
//
// Before the questions are timed their answers are held against a search of all bytes.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <string>
#include <vector>

#include "bench/corpus.h"
#include "program/project_files.h"
#include "project/word_filters.h"
#include "project/word_search.h"

namespace quillet::bench {
namespace {

constexpr Version kProjectVersion{{3, 12, 0}, 3};
constexpr std::array<Text, 5> kAsked = {"self", "path", "__init__", "sympify", "a_name_that_nobody_gave"};

struct Project {
  Files files{kProjectVersion};
  ProjectFiles project{files, {TheCorpus().folder}};
};

// One that was searched, whose answers leave nothing out.
Project& SearchedProject() {
  static std::optional<Project> at;
  if (at) return *at;
  at.emplace();
  for (const Text word : kAsked) {
    const std::vector<FileId> found = at->project.WithWords({word});
    std::string memory;
    for (const FileId file : at->project.All()) {
      if (!HoldsWord(at->files.SourceOf(file, memory), word)) continue;
      if (std::ranges::count(found, file) == 1) continue;
      std::fprintf(stderr, "not timed, a file is not found: %s\n", at->files.PathOf(file).c_str());
      std::exit(1);
    }
  }
  return *at;
}

void WordKeysOfSources(benchmark::State& state) {
  std::vector<std::string> sources = TheCorpus().files;
  for (std::string& source : sources) source.reserve(source.size() + 128);
  WordKeys reader;
  size_t keys = 0;
  for (auto _ : state) {
    keys = 0;
    for (std::string& source : sources) {
      reader.Read(source);
      keys += reader.keys().size();
    }
  }
  state.counters["keys"] = static_cast<double>(keys);
  state.counters["MB/s"] =
      benchmark::Counter(static_cast<double>(TheCorpus().bytes) * static_cast<double>(state.iterations()) / 1e6,
                         benchmark::Counter::kIsRate);
}
BENCHMARK(WordKeysOfSources)->Unit(benchmark::kMillisecond);

// By all threads: the time on the clock and that of the process.
void FirstQuestionOfWords(benchmark::State& state) {
  size_t files = 0, bytes = 0;
  for (auto _ : state) {
    Project at;
    benchmark::DoNotOptimize(at.project.WithWords({kAsked[0]}).size());
    files = at.project.All().size();
    bytes = at.project.ByteSize();
  }
  state.counters["files"] = static_cast<double>(files);
  state.counters["filters MB"] = static_cast<double>(bytes) / 1e6;
}
BENCHMARK(FirstQuestionOfWords)->Unit(benchmark::kMillisecond)->MeasureProcessCPUTime()->UseRealTime();

// Five words, and where each may be a member.
void LaterQuestionsOfWords(benchmark::State& state) {
  Project& at = SearchedProject();
  for (auto _ : state) {
    for (const Text word : kAsked) {
      benchmark::DoNotOptimize(at.project.WithWords({word}).size());
      benchmark::DoNotOptimize(at.project.DefiningMember(word).size());
    }
  }
}
BENCHMARK(LaterQuestionsOfWords)->Unit(benchmark::kMillisecond)->MeasureProcessCPUTime()->UseRealTime();

void RefreshOfFolders(benchmark::State& state) {
  Project& at = SearchedProject();
  for (auto _ : state) benchmark::DoNotOptimize(at.project.Refresh());
}
BENCHMARK(RefreshOfFolders)->Unit(benchmark::kMillisecond);

// The question behind it looks at all files, too.
void RefreshAndQuestion(benchmark::State& state) {
  Project& at = SearchedProject();
  for (auto _ : state) {
    benchmark::DoNotOptimize(at.project.Refresh());
    benchmark::DoNotOptimize(at.project.WithWords({kAsked.back()}).size());
  }
}
BENCHMARK(RefreshAndQuestion)->Unit(benchmark::kMillisecond)->MeasureProcessCPUTime()->UseRealTime();

}  // namespace
}  // namespace quillet::bench
