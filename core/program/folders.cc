// Links are followed when their names are asked for, as most never are.
#include "program/folders.h"

namespace quillet {

namespace {

// The name of the module that a file is, such as `a` of `a.cpython-313-x86_64-linux-gnu.so`; empty for any other.
Text CompiledModule(Text name) {
  if (!name.ends_with(".so") && !name.ends_with(".pyd")) return {};
  return name.substr(0, name.find('.'));
}

Text SourceModule(Text name) {
  if (name.ends_with(".py")) return name.substr(0, name.size() - 3);
  if (name.ends_with(".pyi")) return name.substr(0, name.size() - 4);
  return {};
}

// Whether an entry of a folder says where modules are; a link may lead to one.
bool CountsForModules(const FolderEntry& entry) {
  const Text name = entry.name;
  switch (entry.kind) {
    case FolderEntry::Kind::kFile:
      return !SourceModule(name).empty() || !CompiledModule(name).empty();
    case FolderEntry::Kind::kFolder:
      return !name.starts_with('.') && name != "__pycache__";
    case FolderEntry::Kind::kLink:
      return true;
    case FolderEntry::Kind::kOther:
      return false;
  }
  return false;
}

// Of the entries that count, in any order.
uint64_t DigestOf(const std::vector<FolderEntry>& entries) {
  uint64_t digest = 0;
  for (const FolderEntry& entry : entries) {
    if (CountsForModules(entry)) digest += std::hash<Text>()(entry.name) * (2 * static_cast<uint64_t>(entry.kind) + 1);
  }
  return digest;
}

}  // namespace

Folders::Listing& Folders::Of(const std::string& folder) {
  if (const auto found = listings_.find(folder); found != listings_.end()) return found->second;
  Listing listing;
  listing.stamp = SettledStamp(StampOf(folder));
  std::vector<FolderEntry> entries = EntriesOf(folder);
  listing.digest = DigestOf(entries);
  for (FolderEntry& entry : entries) {
    const Kind kind = entry.kind == FolderEntry::Kind::kFile     ? Kind::kFile
                      : entry.kind == FolderEntry::Kind::kFolder ? Kind::kFolder
                      : entry.kind == FolderEntry::Kind::kLink   ? Kind::kLink
                                                                 : Kind::kNone;
    if (const Text module = CompiledModule(entry.name); !module.empty()) listing.compiled.emplace(module, true);
    listing.entries.emplace(std::move(entry.name), kind);
  }
  for (const FileId buffer : files_.Buffers()) {
    const Text path = files_.PathOf(buffer);
    if (path.size() <= folder.size() || !IsWithin(path, folder)) continue;
    const Text below = path.substr(folder.ends_with('/') ? folder.size() : folder.size() + 1);
    const size_t slash = below.find('/');
    listing.entries.emplace(below.substr(0, slash), slash == Text::npos ? Kind::kFile : Kind::kFolder);
  }
  return listings_.emplace(folder, std::move(listing)).first->second;
}

Folders::Kind Folders::KindOf(const std::string& folder, const std::string& name, Kind& kind) {
  if (kind == Kind::kLink) {
    const FileStamp stamp = StampOf(Join(folder, name));
    kind = stamp.is_file() ? Kind::kFile : stamp.is_folder() ? Kind::kFolder : Kind::kNone;
  }
  return kind;
}

bool Folders::Has(const std::string& folder, Text name, Kind kind) {
  Listing& listing = Of(folder);
  const auto found = listing.entries.find(name);
  return found != listing.entries.end() && KindOf(folder, found->first, found->second) == kind;
}

bool Folders::HasCompiled(const std::string& folder, Text module) {
  const Listing& listing = Of(folder);
  return !listing.compiled.empty() && listing.compiled.contains(module);
}

bool Folders::Refresh() {
  for (auto& [folder, listing] : listings_) {
    const FileStamp stamp = StampOf(folder);
    if (stamp == listing.stamp) continue;
    listing.stamp = SettledStamp(stamp);
    if (DigestOf(EntriesOf(folder)) == listing.digest) continue;
    listings_.clear();
    return true;
  }
  return false;
}

Folders::Names Folders::NamesIn(const std::string& folder) {
  Names names;
  Listing& listing = Of(folder);
  for (auto& [name, kind] : listing.entries) {
    if (KindOf(folder, name, kind) == Kind::kFolder) {
      names.folders.push_back(name);
    } else if (kind == Kind::kFile) {
      Text module = SourceModule(name);
      if (module.empty()) module = CompiledModule(name);
      if (!module.empty()) names.modules.push_back(module);
    }
  }
  return names;
}

}  // namespace quillet
