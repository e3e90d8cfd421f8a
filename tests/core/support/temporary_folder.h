// A folder of files that goes with the test.
#pragma once

#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <string>
#include <utility>

namespace quillet::testing {

class TemporaryFolder {
 public:
  // Its name begins with `prefix`, which orders it before or behind the others.
  explicit TemporaryFolder(const std::string& prefix = "quillet-") {
    std::string name = (std::filesystem::temp_directory_path() / (prefix + "XXXXXX")).string();
    path_ = std::filesystem::canonical(mkdtemp(name.data())).string();
  }
  TemporaryFolder(std::initializer_list<std::pair<const char*, const char*>> files) : TemporaryFolder() {
    for (const auto& [path, text] : files) Write(path, text);
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  const std::string& path() const { return path_; }
  std::string operator/(const std::string& below) const { return path_ + "/" + below; }

  // Makes the folders that it needs.
  void Write(const std::string& below, const std::string& text) const {
    const std::string path = *this / below;
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    std::ofstream(path, std::ios::binary) << text;
  }
  void Link(const std::string& target, const std::string& below) const {
    std::filesystem::create_directories(std::filesystem::path(*this / below).parent_path());
    std::filesystem::create_symlink(target, *this / below);
  }
  void Remove(const std::string& below) const { std::filesystem::remove_all(*this / below); }

 private:
  std::string path_;
};

}  // namespace quillet::testing
