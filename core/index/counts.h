// How many records there are of each kind, and of which names most.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "index/words.h"

namespace quillet {

// Writes the counts of each file that is analysed.
std::unique_ptr<FileWriter> MakeCountsWriter();

// The sum of what such a writer wrote of many files.
class RecordCounts {
 public:
  // False for anything else.
  bool Add(Text written);

  // By the number of the kind.
  const std::vector<uint64_t>& kinds() const { return kinds_; }
  // The names that most records are of, most first, and then by their bytes.
  std::vector<std::pair<Text, uint64_t>> MostUsed(size_t count) const;

 private:
  std::vector<uint64_t> kinds_ = std::vector<uint64_t>(RecordKindWords().size());
  WordTable names_;
  std::vector<uint64_t> counts_;  // by the number of the name
};

}  // namespace quillet
