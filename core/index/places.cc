// Paths are compared as texts; the disk is asked once a folder, and once a link.
#include "index/places.h"

#include <algorithm>
#include <filesystem>

#include "foundations/file_status.h"

namespace quillet {

namespace {

constexpr char kSeparator = static_cast<char>(std::filesystem::path::preferred_separator);

bool IsSeparator(char c) { return c == '/' || (kSeparator == '\\' && c == '\\'); }

bool IsBelow(Text path, Text folder) {
  while (!folder.empty() && IsSeparator(folder.back())) folder.remove_suffix(1);
  return path.starts_with(folder) && (path.size() == folder.size() || IsSeparator(path[folder.size()]));
}

bool IsAbsolute(Text path) {
  if (path.starts_with('/')) return true;
  return kSeparator == '\\' && (path.starts_with('\\') || path.substr(1, 1) == ":");
}

// Whether a part of a path leads upwards, or to a place that only some systems know.
bool LeadsAway(Text path) {
  if (kSeparator == '\\' && path.find_first_of("\\:") != Text::npos) return true;
  for (size_t begin = 0; begin <= path.size();) {
    const size_t end = std::min(path.find('/', begin), path.size());
    if (path.substr(begin, end - begin) == "..") return true;
    begin = end + 1;
  }
  return false;
}

std::string Normal(Text path) {
  const std::filesystem::path normal =
      std::filesystem::path(std::u8string(path.begin(), path.end())).lexically_normal();
  const std::u8string text = normal.u8string();
  return {text.begin(), text.end()};
}

}  // namespace

Places::Places(std::string base, std::vector<std::string> roots) : base_(std::move(base)), roots_(std::move(roots)) {}

std::optional<std::string> Places::PathOf(Text stored) const {
  if (stored.empty() || stored.find('\0') != Text::npos) return std::nullopt;
  if (IsAbsolute(stored)) {
    std::string path = Normal(stored);
    if (std::none_of(roots_.begin(), roots_.end(), [&](const std::string& root) { return IsBelow(path, root); }))
      return std::nullopt;
    return path;
  }
  if (LeadsAway(stored)) return std::nullopt;
  std::string path = base_;
  if (!IsSeparator(path.back())) path += kSeparator;
  return path.append(stored);
}

bool Places::Holds(const std::string& path) {
  const std::optional<FileStatus> status = StatusOf(path, false);
  if (status && status->is_link) return IsReallyBelow(path);
  const std::string folder = path.substr(0, std::max<size_t>(path.find_last_of(kSeparator == '/' ? "/" : "/\\"), 1));
  const auto [found, is_new] = folders_.try_emplace(folder, false);
  if (is_new) found->second = IsReallyBelow(folder);
  return found->second;
}

bool Places::IsReallyBelow(const std::string& path) {
  if (real_.empty()) {
    real_.push_back(RealPathOf(base_));
    for (const std::string& root : roots_) real_.push_back(RealPathOf(root));
  }
  const std::string real = RealPathOf(path);
  return !real.empty() && std::any_of(real_.begin(), real_.end(), [&](const std::string& folder) {
    return !folder.empty() && IsBelow(real, folder);
  });
}

}  // namespace quillet
