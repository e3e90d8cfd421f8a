// By the calls of POSIX, and by those of the standard library on Windows.
#include "project/file_system.h"

#include <chrono>
#include <filesystem>
#include <system_error>

#include "analysis/source_bytes.h"

#ifdef _WIN32
#include <algorithm>
#else
#include <sys/stat.h>
#endif

namespace quillet {

namespace {

namespace fs = std::filesystem;

constexpr uint64_t kMostBytesOfSmallFile = 1 << 20;

fs::path NativePath(Text path) {
#ifdef _WIN32
  return fs::path(std::u8string(path.begin(), path.end()));
#else
  return fs::path(path);
#endif
}

std::string TextOfPath(const fs::path& path) {
#ifdef _WIN32
  const std::u8string text = path.generic_u8string();
  return std::string(text.begin(), text.end());
#else
  return path.string();
#endif
}

// How long the part of a path is that `..` cannot leave: "/", or "c:/", or nothing.
size_t TopSize(Text path) {
#ifdef _WIN32
  if (path.size() >= 3 && path[1] == ':' && path[2] == '/') return 3;
#endif
  return path.starts_with('/') ? 1 : 0;
}

}  // namespace

#ifdef _WIN32

FileStamp StampOf(const std::string& path) {
  std::error_code error;
  const fs::path native = NativePath(path);
  const fs::file_status status = fs::status(native, error);
  if (error || status.type() == fs::file_type::not_found) return {};
  const bool is_folder = status.type() == fs::file_type::directory;
  if (!is_folder && status.type() != fs::file_type::regular) return {.kind = FileStamp::Kind::kOther};
  FileStamp stamp{.kind = is_folder ? FileStamp::Kind::kFolder : FileStamp::Kind::kFile};
  if (!is_folder) stamp.size = fs::file_size(native, error);
  stamp.modified = fs::last_write_time(native, error).time_since_epoch().count();
  return stamp;
}

#else

FileStamp StampOf(const std::string& path) {
  struct stat info;
  if (path.find('\0') != std::string::npos || stat(path.c_str(), &info) != 0) return {};
  FileStamp stamp;
  stamp.kind = S_ISREG(info.st_mode) ? FileStamp::Kind::kFile
               : S_ISDIR(info.st_mode) ? FileStamp::Kind::kFolder
                                       : FileStamp::Kind::kOther;
  if (!stamp.is_file() && !stamp.is_folder()) return stamp;
  if (stamp.is_file()) stamp.size = static_cast<uint64_t>(info.st_size);
#ifdef __APPLE__
  const timespec& time = info.st_mtimespec;
#else
  const timespec& time = info.st_mtim;
#endif
  stamp.modified = static_cast<int64_t>(time.tv_sec) * 1'000'000'000 + time.tv_nsec;
  stamp.number = info.st_ino;
  return stamp;
}

#endif

std::vector<FolderEntry> EntriesOf(const std::string& folder) {
  std::vector<FolderEntry> entries;
  if (ListFolder(folder, entries)) entries.clear();
  return entries;
}

std::string ReadSmallFile(const std::string& path) {
  const FileStamp stamp = StampOf(path);
  std::string bytes;
  if (!stamp.is_file() || stamp.size > kMostBytesOfSmallFile || !ReadSourceFile(path, bytes).empty()) bytes.clear();
  return bytes;
}

std::string RealPath(const std::string& path) {
  std::error_code error;
  const fs::path real = fs::canonical(NativePath(path), error);
  return error ? path : TextOfPath(real);
}

std::string NormalPath(Text path) {
  std::string whole;
#ifdef _WIN32
  std::string slashed(path);
  std::replace(slashed.begin(), slashed.end(), '\\', '/');
  path = slashed;
#endif
  if (TopSize(path) == 0) {
    std::error_code error;
    whole = Join(TextOfPath(fs::current_path(error)), path);
    path = whole;
  }
  const size_t top = TopSize(path);
  std::string normal(path.substr(0, top));
  normal.reserve(path.size());
  for (size_t at = top; at < path.size();) {
    const size_t end = std::min(path.find('/', at), path.size());
    const Text part = path.substr(at, end - at);
    at = end + 1;
    if (part.empty() || part == ".") continue;
    if (part == "..") {
      normal.resize(FolderOf(normal).size());
      continue;
    }
    if (normal.size() > top) normal += '/';
    normal += part;
  }
  return normal;
}

Text FolderOf(Text path) {
  const size_t slash = path.rfind('/');
  return path.substr(0, slash == Text::npos ? 0 : std::max(slash, TopSize(path)));
}

Text LastPartOf(Text path) { return path.substr(path.rfind('/') + 1); }

std::string Join(Text folder, Text name) {
  std::string path;
  path.reserve(folder.size() + 1 + name.size());
  path += folder;
  if (!folder.ends_with('/')) path += '/';
  path += name;
  return path;
}

FileStamp SettledStamp(FileStamp stamp) {
  // Longer than the clocks of file systems stand still; Windows's has another beginning and finer steps.
  static constexpr int64_t kTick = 50'000'000;
  const int64_t now =
      std::chrono::duration_cast<std::chrono::nanoseconds>(std::chrono::system_clock::now().time_since_epoch()).count();
  const int64_t age = now - stamp.modified;
  if (age < kTick && age > -kTick) stamp.kind = FileStamp::Kind::kUnsettled;
  return stamp;
}

bool IsWithin(Text path, Text folder) {
  return path.starts_with(folder) &&
         (path.size() == folder.size() || folder.ends_with('/') || path[folder.size()] == '/');
}

}  // namespace quillet
