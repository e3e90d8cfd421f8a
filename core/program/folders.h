// What lies in folders, each read once: so that looking for a module asks memory and not the file system.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "foundations/text.h"
#include "program/files.h"
#include "project/file_system.h"

namespace quillet {

class Folders {
 public:
  // Open buffers of `files` count as if they lay in their folders.
  explicit Folders(const Files& files) : files_(files) {}

  bool HasFile(const std::string& folder, Text name) { return Has(folder, name, Kind::kFile); }
  bool HasFolder(const std::string& folder, Text name) { return Has(folder, name, Kind::kFolder); }
  // Whether a compiled module of that name is there.
  bool HasCompiled(const std::string& folder, Text module);

  // The names of modules that lie there as files or compiled, and those of folders; in no order, maybe twice.
  struct Names {
    std::vector<Text> modules;
    std::vector<Text> folders;
  };
  Names NamesIn(const std::string& folder);

  void Forget() { listings_.clear(); }
  // Looks whether modules, or folders that may hold some, came to the folders that were read, or went; where any did,
  // all are forgotten.
  bool Refresh();

 private:
  enum class Kind : uint8_t { kFile, kFolder, kLink, kNone };
  struct TextHash {
    using is_transparent = void;
    size_t operator()(Text text) const { return std::hash<Text>()(text); }
  };
  template <class Value>
  using TextMap = std::unordered_map<std::string, Value, TextHash, std::equal_to<>>;
  struct Listing {
    FileStamp stamp;      // in front of the reading
    uint64_t digest = 0;  // of what lies there and counts for modules
    TextMap<Kind> entries;
    TextMap<bool> compiled;  // names of modules
  };

  Listing& Of(const std::string& folder);
  bool Has(const std::string& folder, Text name, Kind kind);
  Kind KindOf(const std::string& folder, const std::string& name, Kind& kind);

  const Files& files_;
  TextMap<Listing> listings_;
};

}  // namespace quillet
