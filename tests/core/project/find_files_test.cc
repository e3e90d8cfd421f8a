// Which files of a folder are Python source: by name, rules, first line and links.
#include "project/find_files.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

namespace quillet {
namespace {

namespace fs = std::filesystem;

class FoundFiles : public ::testing::Test {
 protected:
  void SetUp() override {
    top_ = fs::temp_directory_path() /
           ("quillet_find_files_" + std::string(::testing::UnitTest::GetInstance()->current_test_info()->name()));
    fs::remove_all(top_);
    fs::create_directories(top_);
  }
  void TearDown() override { fs::remove_all(top_); }

  void Write(const std::string& path, const std::string& text = "x = 1\n") {
    fs::create_directories((top_ / path).parent_path());
    std::ofstream(top_ / path, std::ios::binary) << text;
  }

  // Paths from the top on, those of problems with what is said.
  std::vector<std::string> In(bool gitignore = true, Text exclude = "") {
    std::vector<std::string> paths;
    for (const FoundFile& file : FindFiles({top_.string()}, {.gitignore = gitignore, .exclude = exclude})) {
      const std::string below = fs::path(file.path).lexically_relative(top_).generic_string();
      paths.push_back(file.problem.empty() ? below : below + ": " + file.problem);
      if (file.problem.empty()) {
        EXPECT_EQ(file.path.substr(file.below), below);
        EXPECT_EQ(file.size, fs::file_size(file.path));
        EXPECT_GT(file.time, 1'000'000'000'000'000'000);
      }
    }
    return paths;
  }

  fs::path top_;
};

using Paths = std::vector<std::string>;

TEST_F(FoundFiles, AreThoseOfPythonInOrder) {
  for (const char* path : {"b.py", "a.pyi", "c.pyw", "d.txt", "sub/a.py", "also/a.py", "node_modules/a.py", ".git/a.py",
                           ".venv/a.py", "__pycache__/a.py", "env/pyvenv.cfg", "env/lib/a.py"})
    Write(path);
  EXPECT_EQ(In(), (Paths{"a.pyi", "b.py", "c.pyw", "also/a.py", "sub/a.py"}));
}

TEST_F(FoundFiles, OfAProgramHaveNoOtherNamesAndNoHiddenFolders) {
  for (const char* path : {"b.py", "a.pyi", "c.pyw", ".hidden/a.py", "sub/.b.py", "env/pyvenv.cfg", "env/lib/a.py"})
    Write(path);
  Write("d", "#!/usr/bin/env python3\n");
  const std::string top = top_.string();
  Paths paths, watched;
  WalkRules rules{.is_program = true, .watch = [&](const std::string& path) { watched.push_back(path); }};
  for (const FoundFile& file : FindFiles({top}, rules)) paths.push_back(file.path.substr(file.below));
  EXPECT_EQ(paths, (Paths{"a.pyi", "b.py", "sub/.b.py"}));
  EXPECT_EQ(watched, (Paths{top, top + "/env", top + "/sub"}));
  Write(".gitignore", "b.py\n");
  watched.clear();
  EXPECT_EQ(FindFiles({top}, rules).size(), 2u);
  EXPECT_EQ(watched.at(1), top + "/.gitignore");
}

TEST_F(FoundFiles, MayNamePythonInTheirFirstLine) {
  Write("a", "#!/usr/bin/env python3.11\n");
  Write("b", "#!/usr/bin/python -E\nx");
  Write("c", "#!/usr/bin/pythonw\n");
  Write("d", "#!/usr/bin/cpython\n");
  Write("e", "# python\n");
  Write("f", "#!/bin/sh\n# python\n");
  Write("g", "#!python");
  Write("h", "");
  EXPECT_EQ(In(), (Paths{"a", "b", "g"}));
}

TEST_F(FoundFiles, AreLeftOutByTheRulesNearestToThem) {
  Write(".git/info/exclude", "excluded.py\n");
  Write(".gitignore", "*_gen.py\n/top.py\nbuild/\n");
  Write("sub/.gitignore", "!a_gen.py\n");
  for (const char* path :
       {"top.py", "excluded.py", "kept.py", "sub/a_gen.py", "sub/b_gen.py", "sub/top.py", "build/a.py"})
    Write(path);
  EXPECT_EQ(In(), (Paths{"kept.py", "sub/a_gen.py", "sub/top.py"}));
  EXPECT_EQ(In(false),
            (Paths{"excluded.py", "kept.py", "top.py", "build/a.py", "sub/a_gen.py", "sub/b_gen.py", "sub/top.py"}));
  EXPECT_EQ(In(true, "sub/\n!top.py\n"), (Paths{"kept.py", "top.py"}));
}

TEST_F(FoundFiles, AreNotFoundTwiceNorElsewhereByLinks) {
  Write("a.py");
  Write("sub/b");
  std::error_code error;
  fs::create_symlink("a.py", top_ / "again.py", error);
  if (error) GTEST_SKIP() << "no links here";
  fs::create_symlink("sub/b", top_ / "other.py");
  fs::create_symlink("sub", top_ / "folder");
  fs::create_symlink("nowhere", top_ / "lost.py");
  fs::create_symlink("nowhere", top_ / "lost");
  fs::create_symlink(fs::temp_directory_path(), top_ / "away");
  EXPECT_EQ(In(), (Paths{"a.py", "lost.py: No such file or directory", "other.py"}));
}

TEST_F(FoundFiles, ThatAreNamedPassAsTheyAre) {
  Write("a.txt");
  const std::string path = (top_ / "a.txt").string();
  const std::vector<FoundFile> found = FindFiles({"-", path, path + ".gone"}, {});
  ASSERT_EQ(found.size(), 3u);
  EXPECT_EQ(found[0].path, "-");
  EXPECT_EQ(found[1].path, path);
  EXPECT_EQ(found[2].argument, 2u);
  for (const FoundFile& file : found) EXPECT_EQ(file.below, 0u);
}

}  // namespace
}  // namespace quillet
