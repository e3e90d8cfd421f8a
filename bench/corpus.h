// The corpus of the benchmarks: every .py file of a folder, read into memory once.
//
// The folder is that of the environment variable QUILLET_BENCH_CORPUS, or the standard library of
// the python3 on the path. Files are read in the order of their names; site-packages is left out.
#pragma once

#include <string>
#include <vector>

namespace quillet::bench {

struct Corpus {
  std::string folder;
  std::vector<std::string> files;  // contents
  size_t bytes = 0;
  size_t lines = 0;  // physical
};

// Read on first use; ends the process with a message where nothing is found.
const Corpus& TheCorpus();

}  // namespace quillet::bench
