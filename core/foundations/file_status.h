// What the operating system says of a path, without a host.
//
// Paths are as it spells them (UTF-8 on Windows); one that holds a NUL leads nowhere.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace quillet {

struct FileStatus {
  uint64_t size = 0;
  int64_t time = 0;  // of the last change, in ns since 1970
  bool is_file = false;
  bool is_folder = false;
  bool is_link = false;  // only where links are not followed
};

// Nothing where there is no such file.
std::optional<FileStatus> StatusOf(const std::string& path, bool follow_links = true);

// Where a path leads when all links are followed, as far as it is there; the rest is kept as it is. Empty where
// that cannot be told.
std::string RealPathOf(const std::string& path);

}  // namespace quillet
