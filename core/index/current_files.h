// The files of an index as they are now, and which of them may answer a question.
//
// The folders that were indexed are walked again, as a run that brings the index up to date would: a file that came
// since may answer, and so may one that changed, whatever the index says of it; one that is gone, or that is ignored
// by now, may not.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "index/name_index.h"
#include "index/places.h"

namespace quillet {

// A file or folder that was indexed. `stored` is how the index spells a file, and what stands in front of the names of
// those in a folder: nothing, or a path that ends with a slash.
struct IndexRoot {
  std::string path;
  std::string stored;
};

struct CurrentFile {
  std::string stored;
  uint64_t size = 0;
  int64_t time = 0;
};

class CurrentFiles {
 public:
  // Walks. `gitignore` and `exclude` are those of FindFiles. May be stopped (stop.h).
  CurrentFiles(const std::vector<IndexRoot>& roots, bool gitignore, Text exclude);

  // Whether a file would be among them if it were there.
  bool Covers(Text stored) const;
  // In the order of their names.
  const std::vector<CurrentFile>& all() const { return all_; }

 private:
  std::vector<std::string> folders_;  // as the index spells them
  std::vector<CurrentFile> all_;
};

// A file that may answer.
struct CandidateFile {
  static constexpr uint32_t kUnknown = UINT32_MAX;
  uint32_t number;  // in the index; kUnknown for one that came since
  std::string stored;
  uint64_t size;  // now
};

// The files that may answer, in the order of their names.
std::vector<CandidateFile> CandidatesFor(const NameIndex& index, const WordNeeds& needs, const CurrentFiles& current,
                                         Places& places);

}  // namespace quillet
