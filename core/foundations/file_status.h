// What the operating system says of a path, without a host.
//
// Paths are as it spells them (UTF-8 on Windows); one that holds a NUL leads nowhere.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "foundations/text.h"

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

// What stands in a folder, in no order. Gives nothing, or the number of the error.
struct ListedEntry {
  enum class Kind : uint8_t { kFile, kFolder, kLink, kOther };
  std::string name;
  Kind kind;
};
std::optional<int> ListFolder(const std::string& path, std::vector<ListedEntry>& entries);

// The first bytes of a regular file, all of them where it is no larger. Neither waits for a pipe nor, without
// `follow_links`, reads what a link leads to. Gives nothing, or the number of the error; EINVAL for what is no file.
std::optional<int> ReadBeginning(const std::string& path, bool follow_links, size_t most, std::string& bytes);

// Why a file, by its descriptor or its path, is not to be read to its end: a device need not have one. Empty for all
// others, a terminal and the null device among them, and for what is not there.
Text DeviceProblem(int descriptor);
Text DeviceProblem(const std::string& path);

}  // namespace quillet
