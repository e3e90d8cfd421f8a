// Reads the corpus: walks the folder, keeps what ends in .py, in the order of the names.
#include "bench/corpus.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>

namespace quillet::bench {

namespace {

std::string StandardLibraryOfPython() {
  std::unique_ptr<FILE, int (*)(FILE*)> pipe(
      popen("python3 -c 'import sysconfig; print(sysconfig.get_path(\"stdlib\"))'", "r"), pclose);
  std::string line;
  std::array<char, 4096> buffer;
  while (pipe && fgets(buffer.data(), buffer.size(), pipe.get())) line += buffer.data();
  while (!line.empty() && line.back() == '\n') line.pop_back();
  return line;
}

Corpus Read() {
  namespace fs = std::filesystem;
  Corpus corpus;
  const char* folder = std::getenv("QUILLET_BENCH_CORPUS");
  corpus.folder = folder ? folder : StandardLibraryOfPython();
  std::vector<fs::path> paths;
  std::error_code error;
  for (fs::recursive_directory_iterator it(corpus.folder, error), end; !error && it != end; it.increment(error)) {
    if (it->is_directory() && it->path().filename() == "site-packages") {
      it.disable_recursion_pending();
    } else if (it->is_regular_file() && it->path().extension() == ".py") {
      paths.push_back(it->path());
    }
  }
  std::sort(paths.begin(), paths.end());
  for (const fs::path& path : paths) {
    std::ifstream in(path, std::ios::binary);
    std::stringstream content;
    content << in.rdbuf();
    corpus.files.push_back(std::move(content).str());
    corpus.bytes += corpus.files.back().size();
    corpus.lines += std::count(corpus.files.back().begin(), corpus.files.back().end(), '\n');
  }
  if (corpus.files.empty()) {
    std::fprintf(stderr, "no .py file below '%s'; set QUILLET_BENCH_CORPUS to a folder that has some\n",
                 corpus.folder.c_str());
    std::exit(2);
  }
  return corpus;
}

}  // namespace

const Corpus& TheCorpus() {
  static const Corpus corpus = Read();
  return corpus;
}

}  // namespace quillet::bench
