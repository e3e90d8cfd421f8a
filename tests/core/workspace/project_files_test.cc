// Which files belong to a project, and which of them hold words.
#include "workspace/project_files.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/core/support/temporary_folder.h"
#include "workspace/word_search.h"

namespace quillet {
namespace {

using testing::TemporaryFolder;
using Paths = std::vector<std::string>;

Paths Below(const TemporaryFolder& folder, const Files& files, const std::vector<FileId>& ids) {
  Paths paths;
  for (const FileId file : ids) paths.push_back(files.PathOf(file).substr(folder.path().size() + 1));
  return paths;
}

Paths All(const TemporaryFolder& folder, const Paths& roots = {""}) {
  Files files(Version::Of(3, 12));
  Paths whole;
  for (const std::string& root : roots) whole.push_back(folder / root);
  return Below(folder, files, ProjectFiles(files, whole).All());
}

TEST(ProjectFiles, AreSourcesAndStubsInOrder) {
  const TemporaryFolder folder = {
      {"b.py", ""},
      {"a/c.pyi", ""},
      {"a/notes.txt", ""},
      {"a/b/d.py", ""},
      {".hidden/e.py", ""},
      {"a/__pycache__/f.py", ""},
      {"node_modules/x/g.py", ""},
      {"env/pyvenv.cfg", ""},
      {"env/lib/python3.12/site-packages/h.py", ""},
      {"tool", "#!/usr/bin/env python3\n"},
  };
  EXPECT_EQ(All(folder), (Paths{"a/b/d.py", "a/c.pyi", "b.py"}));
  EXPECT_EQ(All(folder, {"a", "", "a/b"}), (Paths{"a/b/d.py", "a/c.pyi", "b.py"}));
  EXPECT_EQ(All(folder, {"b.py"}), (Paths{"b.py"}));
  EXPECT_EQ(All(folder, {"env"}), (Paths{"env/lib/python3.12/site-packages/h.py"}));
  EXPECT_EQ(All(folder, {"nothing"}), Paths());
}

TEST(ProjectFiles, LeaveOutWhatRulesExclude) {
  const TemporaryFolder folder = {
      {".git/info/exclude", "secret.py\n"},
      {".gitignore", "build/\n*.gen.py\n!keep.gen.py\n/only_top.py\n"},
      {"build/a.py", ""},
      {"pack/a.gen.py", ""},
      {"pack/keep.gen.py", ""},
      {"pack/secret.py", ""},
      {"only_top.py", ""},
      {"pack/only_top.py", ""},
      {"pack/.gitignore", "!secret.py\n"},
      {"other/secret.py", ""},
      {"sub/.git/HEAD", ""},
      {"sub/a.gen.py", ""},
  };
  const Paths kept = {"pack/keep.gen.py", "pack/only_top.py", "pack/secret.py", "sub/a.gen.py"};
  EXPECT_EQ(All(folder), kept);
  // Those of the folders above hold, too; what is named is wanted all the same.
  EXPECT_EQ(All(folder, {"pack"}), (Paths{"pack/keep.gen.py", "pack/only_top.py", "pack/secret.py"}));
  EXPECT_EQ(All(folder, {"build"}), (Paths{"build/a.py"}));
}

TEST(ProjectFiles, FollowNoLinksToFolders) {
  const TemporaryFolder folder = {{"project/a/b.py", ""}, {"elsewhere/c.py", ""}};
  folder.Link("..", "project/a/up");
  folder.Link("../elsewhere", "project/out");
  folder.Link("a/b.py", "project/same.py");
  folder.Link("../elsewhere/c.py", "project/c.py");
  folder.Link("nothing", "project/dangling.py");
  EXPECT_EQ(All(folder, {"project"}), (Paths{"project/a/b.py"}));
}

TEST(ProjectFiles, CountBuffers) {
  const TemporaryFolder folder = {{"a.py", "one\n"}};
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {folder.path()});
  EXPECT_EQ(project.All().size(), 1u);
  files.Open(files.NumberOf(folder / "b.py"), "two = 1\n");
  files.Open(files.NumberOf("/elsewhere.py"), "two = 1\n");
  EXPECT_EQ(project.All().size(), 1u);
  project.Forget();
  EXPECT_EQ(Below(folder, files, project.All()), (Paths{"a.py", "b.py"}));
  EXPECT_EQ(Below(folder, files, project.WithWords({"two"})), (Paths{"b.py"}));
}

TEST(ProjectFiles, AreFoundByWholeWords) {
  const TemporaryFolder folder = {
      {"a.py", "def total(cart): pass\n"},
      {"b.py", "subtotal = total_of(x)\n"},
      {"c.py", "print(total)\n"},
      {"d.py", "total"},
      {"e.py", ""},
  };
  // So many that another thread helps.
  for (int i = 0; i < 200; ++i) folder.Write("many/m" + std::to_string(i) + ".py", "x = " + std::to_string(i) + "\n");
  folder.Write("many/m77.py", "total\n");
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {folder.path()});
  EXPECT_EQ(Below(folder, files, project.WithWords({"total"})), (Paths{"a.py", "c.py", "d.py", "many/m77.py"}));
  EXPECT_EQ(Below(folder, files, project.WithWords({"total", "cart"})), (Paths{"a.py"}));
  EXPECT_TRUE(project.WithWords({"total", "nothing"}).empty());
}

TEST(WordSearch, FindsWholeWordsAtEveryPlace) {
  const std::string word = "total";
  for (size_t before = 0; before < 40; ++before) {
    for (size_t behind = 0; behind < 40; ++behind) {
      const std::string text = std::string(before, ' ') + word + std::string(behind, '.');
      EXPECT_EQ(FindWord(text, word), before) << before << " " << behind;
      EXPECT_EQ(FindWord(std::string(before, ' ') + "x" + text.substr(before), word), Text::npos);
      EXPECT_EQ(FindWord(text.substr(0, before + 5) + "_" + std::string(behind, '.'), word), Text::npos);
      EXPECT_EQ(FindWord(text.substr(0, before + 4) + std::string(behind, '.'), word), Text::npos);
    }
  }
  EXPECT_EQ(FindWord("a b a", "a", 1), 4u);
  EXPECT_EQ(FindWord("a", ""), Text::npos);
  EXPECT_EQ(FindWord("", "a"), Text::npos);
  EXPECT_FALSE(HoldsWord("\xC3\xA4total", "total"));
}

}  // namespace
}  // namespace quillet
