// One call of the system a file where there is one.
#include "foundations/file_status.h"

#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <system_error>

#ifndef _WIN32
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#endif

namespace quillet {

namespace {

std::filesystem::path WideOf(const std::string& path) {
#ifdef _WIN32
  return std::u8string(path.begin(), path.end());
#else
  return path;
#endif
}

}  // namespace

#ifdef _WIN32

std::optional<FileStatus> StatusOf(const std::string& path, bool follow_links) {
  if (path.find('\0') != std::string::npos) return std::nullopt;
  std::error_code error;
  const std::filesystem::path wide = WideOf(path);
  const auto kind =
      (follow_links ? std::filesystem::status(wide, error) : std::filesystem::symlink_status(wide, error));
  if (error || kind.type() == std::filesystem::file_type::not_found) return std::nullopt;
  FileStatus status;
  status.is_file = std::filesystem::is_regular_file(kind);
  status.is_folder = std::filesystem::is_directory(kind);
  status.is_link = std::filesystem::is_symlink(kind);
  if (status.is_file) status.size = std::filesystem::file_size(wide, error);
  if (!status.is_link) {
    const auto changed = std::filesystem::last_write_time(wide, error);
    status.time = std::chrono::duration_cast<std::chrono::nanoseconds>(
                      std::chrono::clock_cast<std::chrono::system_clock>(changed).time_since_epoch())
                      .count();
  }
  return status;
}

#else

std::optional<FileStatus> StatusOf(const std::string& path, bool follow_links) {
  if (path.find('\0') != std::string::npos) return std::nullopt;
  struct stat info;
  if ((follow_links ? stat(path.c_str(), &info) : lstat(path.c_str(), &info)) != 0) return std::nullopt;
#ifdef __APPLE__
  const timespec& changed = info.st_mtimespec;
#else
  const timespec& changed = info.st_mtim;
#endif
  FileStatus status;
  status.size = static_cast<uint64_t>(info.st_size);
  status.time = int64_t{changed.tv_sec} * 1'000'000'000 + changed.tv_nsec;
  status.is_file = S_ISREG(info.st_mode);
  status.is_folder = S_ISDIR(info.st_mode);
  status.is_link = S_ISLNK(info.st_mode);
  return status;
}

#endif

#ifdef _WIN32

std::optional<int> ListFolder(const std::string& path, std::vector<ListedEntry>& entries) {
  using Kind = ListedEntry::Kind;
  entries.clear();
  std::error_code error;
  for (std::filesystem::directory_iterator at(WideOf(path), error), end; !error && at != end; at.increment(error)) {
    const std::u8string name = at->path().filename().u8string();
    const std::filesystem::file_status kind = at->symlink_status(error);
    entries.push_back({{name.begin(), name.end()},
                       std::filesystem::is_symlink(kind)        ? Kind::kLink
                       : std::filesystem::is_directory(kind)    ? Kind::kFolder
                       : std::filesystem::is_regular_file(kind) ? Kind::kFile
                                                                : Kind::kOther});
  }
  return error ? std::optional<int>(error.default_error_condition().value()) : std::nullopt;
}

std::optional<int> ReadBeginning(const std::string& path, bool follow_links, size_t most, std::string& bytes) {
  const std::optional<FileStatus> status = StatusOf(path, follow_links);
  if (!status) return ENOENT;
  if (!status->is_file) return EINVAL;
  std::ifstream file(WideOf(path), std::ios::binary);
  if (!file) return EACCES;
  bytes.resize(most);
  file.read(bytes.data(), static_cast<std::streamsize>(most));
  bytes.resize(static_cast<size_t>(file.gcount()));
  return std::nullopt;
}

#else

std::optional<int> ListFolder(const std::string& path, std::vector<ListedEntry>& entries) {
  using Kind = ListedEntry::Kind;
  entries.clear();
  if (path.find('\0') != std::string::npos) return ENOENT;
  DIR* const folder = opendir(path.c_str());
  if (folder == nullptr) return errno;
  errno = 0;
  while (const dirent* const entry = readdir(folder)) {
    std::string name = entry->d_name;
    if (name == "." || name == "..") continue;
    Kind kind = entry->d_type == DT_REG ? Kind::kFile
                : entry->d_type == DT_DIR ? Kind::kFolder
                : entry->d_type == DT_LNK ? Kind::kLink
                                          : Kind::kOther;
    if (entry->d_type == DT_UNKNOWN) {
      const std::optional<FileStatus> status = StatusOf(path + "/" + name, false);
      if (status && status->is_file) kind = Kind::kFile;
      if (status && status->is_folder) kind = Kind::kFolder;
      if (status && status->is_link) kind = Kind::kLink;
    }
    entries.push_back({std::move(name), kind});
    errno = 0;
  }
  const int error = errno;
  closedir(folder);
  return error != 0 ? std::optional<int>(error) : std::nullopt;
}

std::optional<int> ReadBeginning(const std::string& path, bool follow_links, size_t most, std::string& bytes) {
  bytes.clear();
  const int file = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | (follow_links ? 0 : O_NOFOLLOW));
  if (file < 0) return errno;
  struct stat info;
  std::optional<int> error;
  if (fstat(file, &info) != 0) {
    error = errno;
  } else if (!S_ISREG(info.st_mode)) {
    error = EINVAL;
  } else {
    bytes.resize(most);
    size_t size = 0;
    while (size < most) {
      const ssize_t count = read(file, bytes.data() + size, most - size);
      if (count < 0 && errno == EINTR) continue;
      if (count < 0) error = errno;
      if (count <= 0) break;
      size += static_cast<size_t>(count);
    }
    bytes.resize(size);
  }
  close(file);
  return error;
}

#endif

#ifdef _WIN32

Text DeviceProblem(int) { return {}; }
Text DeviceProblem(const std::string&) { return {}; }

#else

Text DeviceProblem(int descriptor) {
  struct stat info;
  if (fstat(descriptor, &info) != 0) return {};
  if (S_ISBLK(info.st_mode)) return "is a block device";
  if (!S_ISCHR(info.st_mode) || isatty(descriptor)) return {};
  struct stat null;
  const bool is_null = stat("/dev/null", &null) == 0 && null.st_rdev == info.st_rdev;
  return is_null ? Text() : Text("is a device");
}

Text DeviceProblem(const std::string& path) {
  struct stat info;
  if (stat(path.c_str(), &info) != 0 || !(S_ISBLK(info.st_mode) || S_ISCHR(info.st_mode))) return {};
  const int file = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
  if (file < 0) return {};
  const Text problem = DeviceProblem(file);
  close(file);
  return problem;
}

#endif

std::string RealPathOf(const std::string& path) {
  if (path.find('\0') != std::string::npos) return {};
#ifndef _WIN32
  if (char* const whole = realpath(path.c_str(), nullptr)) {
    std::string real(whole);
    std::free(whole);
    return real;
  }
#endif
  std::error_code error;
  const std::filesystem::path real = std::filesystem::weakly_canonical(WideOf(path), error);
  if (error) return {};
#ifdef _WIN32
  const std::u8string text = real.u8string();
  return {text.begin(), text.end()};
#else
  return real.string();
#endif
}

}  // namespace quillet
