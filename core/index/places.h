// Which files of an index may be looked at.
//
// An index may have come from anybody, so what it says of paths is only believed of its own folder and of those
// that the caller names, with links followed to the end.
#pragma once

#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "foundations/text.h"

namespace quillet {

// The folders whose files may be shown. One thread at a time.
class Places {
 public:
  // The folder of the index and others, by absolute paths.
  Places(std::string base, std::vector<std::string> roots);

  // The absolute path of a file by its name in the index; nothing where it leads elsewhere.
  std::optional<std::string> PathOf(Text stored) const;

  // Whether such a path does not leave the folders by a link, either. Looks at the disk.
  bool Holds(const std::string& path);

 private:
  bool IsReallyBelow(const std::string& path);

  std::string base_;
  std::vector<std::string> roots_;
  std::vector<std::string> real_;                  // all of them, found at first need
  std::unordered_map<std::string, bool> folders_;  // of files, and whether they lie in one of those
};

}  // namespace quillet
