// Declarations and implementations: where a name is said to be, and what there is of it below.
#include <algorithm>
#include <set>

#include "workspace/workspace_impl.h"

namespace quillet {

std::vector<Location> Workspace::Declarations(FileId id, uint32_t offset) {
  Impl& in = *impl_;
  in.Begin();
  const SourceFile* file = in.Get(id);
  const uint32_t index = file == nullptr ? kNoIndex : in.OccurrenceAt(*file, offset);
  std::vector<Location> found;
  if (index != kNoIndex) found = in.LocationsOf(in.inference.EntitiesOf(*file, index), false);
  in.Sort(found);
  return found.empty() ? Definitions(id, offset) : found;
}

std::vector<Location> Workspace::Implementations(FileId id, uint32_t offset) {
  static constexpr size_t kMostClasses = 2000;
  std::vector<Location> found;
  std::set<std::pair<FileId, uint32_t>> met;
  std::vector<std::pair<FileId, uint32_t>> pending{{id, offset}};
  for (size_t i = 0; i < pending.size() && met.size() < kMostClasses; ++i) {
    for (const Location& below : Subtypes(pending[i].first, pending[i].second)) {
      if (!met.emplace(below.file, below.begin).second) continue;
      found.push_back(below);
      // What overrides a method is told in all degrees at once.
      if (below.kind == "class") pending.emplace_back(below.file, below.begin);
    }
  }
  if (found.empty()) return Definitions(id, offset);
  impl_->is_bounded |= met.size() >= kMostClasses;
  impl_->Sort(found);
  return found;
}

}  // namespace quillet
