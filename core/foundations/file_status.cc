// One call of the system a file where there is one.
#include "foundations/file_status.h"

#include <chrono>
#include <filesystem>
#include <system_error>

#ifndef _WIN32
#include <sys/stat.h>

#include <cstdlib>
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
