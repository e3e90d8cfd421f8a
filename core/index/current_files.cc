// Both lists are in order of their names, and merged.
#include "index/current_files.h"

#include <algorithm>
#include <optional>
#include <utility>

#include "analysis/source_bytes.h"
#include "foundations/file_status.h"
#include "index/words.h"
#include "project/find_files.h"

namespace quillet {

namespace {

bool HasItsContent(const std::string& path, uint64_t size, const IndexedFile& file) {
  if (size != file.size) return false;
  std::string bytes;
  return ReadSourceFile(path, bytes).empty() && HashOfBytes(bytes) == file.hash;
}

}  // namespace

CurrentFiles::CurrentFiles(const std::vector<IndexRoot>& roots, bool gitignore, Text exclude) {
  std::vector<std::string> arguments;
  for (const IndexRoot& root : roots) {
    arguments.push_back(root.path);
    if (root.stored.empty() || root.stored.ends_with('/')) folders_.push_back(root.stored);
  }
  for (const FoundFile& file : FindFiles(arguments, {.gitignore = gitignore, .exclude = exclude})) {
    if (!file.problem.empty()) continue;
    const std::string& stored = roots[file.argument].stored;
    if (file.below != 0) {
      all_.push_back({stored + file.path.substr(file.below), file.size, file.time});
    } else if (const std::optional<FileStatus> status = StatusOf(file.path); status && status->is_file) {
      all_.push_back({stored, status->size, status->time});
    }
  }
  std::ranges::sort(all_, {}, &CurrentFile::stored);
  const auto is_same = [](const CurrentFile& a, const CurrentFile& b) { return a.stored == b.stored; };
  all_.erase(std::unique(all_.begin(), all_.end(), is_same), all_.end());
}

bool CurrentFiles::Covers(Text stored) const {
  return std::ranges::any_of(folders_, [&](const std::string& folder) {
    return folder.empty() ? !stored.starts_with('/') : stored.starts_with(folder);
  });
}

std::vector<CandidateFile> CandidatesFor(const NameIndex& index, const WordNeeds& needs, const CurrentFiles& current,
                                         Places& places) {
  std::vector<CandidateFile> found;
  const std::vector<uint32_t> wanted = index.FilesFor(needs);
  auto next_wanted = wanted.begin();
  auto next = current.all().begin();
  const auto add_new = [&](auto&& is_before) {
    for (; next != current.all().end() && is_before(*next); ++next) {
      const std::optional<std::string> path = places.PathOf(next->stored);
      if (path && places.Holds(*path)) found.push_back({CandidateFile::kUnknown, next->stored, next->size});
    }
  };
  for (uint32_t number = 0; number < index.size(); ++number) {
    const IndexedFile& known = index[number];
    const bool is_wanted = next_wanted != wanted.end() && *next_wanted == number;
    if (is_wanted) ++next_wanted;
    add_new([&](const CurrentFile& file) { return file.stored < known.path; });
    const std::optional<std::string> path = places.PathOf(known.path);
    if (!path) continue;
    CurrentFile file = {known.path};
    if (next != current.all().end() && next->stored == known.path) {
      file = *next++;
    } else {
      if (current.Covers(known.path)) continue;
      const std::optional<FileStatus> status = StatusOf(*path);
      if (!status || !status->is_file) continue;
      file.size = status->size;
      file.time = status->time;
    }
    // What has its size and time is not looked at; whatever is read must lie in its place.
    const bool is_as_known = file.size == known.size && file.time == known.time;
    if ((!is_wanted && is_as_known) || !places.Holds(*path)) continue;
    if (is_wanted || !HasItsContent(*path, file.size, known)) found.push_back({number, file.stored, file.size});
  }
  add_new([](const CurrentFile&) { return true; });
  return found;
}

}  // namespace quillet
