// Which files belong to a project, which of them hold words or define names, and what is noticed when they change.
#include "program/project_files.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "foundations/file_status.h"
#include "index/name_index.h"
#include "project/word_filters.h"
#include "project/word_search.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/temporary_folder.h"

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

// What went wrong before counts for nothing.
TEST(Folders, AreListed) {
  const TemporaryFolder folder = {{"a.py", ""}, {"b/c.py", ""}};
  std::filesystem::create_directory(folder.path() + "/empty");
  for (const int before : {0, EACCES}) {
    std::vector<ListedEntry> entries;
    errno = before;
    EXPECT_EQ(ListFolder(folder.path(), entries), std::nullopt);
    EXPECT_EQ(entries.size(), 3u);
    EXPECT_EQ(ListFolder(folder.path() + "/b", entries), std::nullopt);
    EXPECT_EQ(entries.size(), 1u);
    errno = before;
    EXPECT_EQ(ListFolder(folder.path() + "/empty", entries), std::nullopt);
    EXPECT_EQ(entries.size(), 0u);
    EXPECT_EQ(ListFolder(folder.path() + "/d", entries), ENOENT);
    EXPECT_EQ(ListFolder(folder.path() + "/a.py", entries), ENOTDIR);
  }
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

TEST(ProjectFiles, LeaveOutWhatSettingsExclude) {
  const TemporaryFolder folder = {{".git/HEAD", ""},         {".gitignore", "made/\n"}, {"a.py", ""},
                                  {"made/b.py", ""},         {"old/c.py", ""},          {"sub/old/d.py", ""},
                                  {"sub/made/e_gen.py", ""}, {"sub/f_gen.py", ""},      {"sub/keep_gen.py", ""}};
  Files files(Version::Of(3, 12));
  const auto all = [&](const Paths& roots, Text exclude) {
    Paths whole;
    for (const std::string& root : roots) whole.push_back(folder / root);
    return Below(folder, files, ProjectFiles(files, whole, exclude).All());
  };
  EXPECT_EQ(all({""}, "/old/\n*_gen.py\n!keep_gen.py"), (Paths{"a.py", "sub/keep_gen.py", "sub/old/d.py"}));
  EXPECT_EQ(all({"sub", "old"}, "/old"), (Paths{"old/c.py", "sub/f_gen.py", "sub/keep_gen.py"}));
  EXPECT_EQ(all({""}, "!made/"), (Paths{"a.py", "made/b.py", "old/c.py", "sub/f_gen.py", "sub/keep_gen.py",
                                        "sub/made/e_gen.py", "sub/old/d.py"}));
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
  EXPECT_EQ(project.ByteSize(), 0u);
  for (const char* how : {"searched", "by filters"}) {
    EXPECT_EQ(Below(folder, files, project.WithWords({"total"})), (Paths{"a.py", "c.py", "d.py", "many/m77.py"}))
        << how;
  }
  EXPECT_GT(project.ByteSize(), 0u);
  EXPECT_EQ(Below(folder, files, project.WithWords({"total", "cart"})), (Paths{"a.py"}));
  EXPECT_TRUE(project.WithWords({"total", "nothing"}).empty());
}

// A folder of files, of which a project was asked before they change.
struct Changing {
  TemporaryFolder folder = {
      {"a.py", "class A:\n  def total(): pass\n"}, {"b.py", "x = 1\n"}, {"sub/c.py", "total()\n"}};
  Files files{Version::Of(3, 12)};
  ProjectFiles project{files, {folder.path()}};

  Changing() {
    EXPECT_EQ(With("total"), (Paths{"a.py", "sub/c.py"}));
    EXPECT_EQ(With("total"), (Paths{"a.py", "sub/c.py"})) << "by filters";
  }
  Paths All() { return Below(folder, files, project.All()); }
  Paths With(Text word) { return Below(folder, files, project.WithWords({word})); }
  Paths DefiningMember(Text name) { return Below(folder, files, project.DefiningMember(name)); }
};

TEST(ProjectFiles, SeeWhatComesAndGoes) {
  Changing at;
  EXPECT_FALSE(at.project.Refresh());
  at.folder.Write("sub/new.py", "self.total = 2\n");
  at.folder.Write("other/deep/d.py", "total\n");
  EXPECT_TRUE(at.project.Refresh());
  EXPECT_EQ(at.All(), (Paths{"a.py", "b.py", "other/deep/d.py", "sub/c.py", "sub/new.py"}));
  EXPECT_EQ(at.With("total"), (Paths{"a.py", "other/deep/d.py", "sub/c.py", "sub/new.py"}));
  EXPECT_FALSE(at.project.Refresh());
  at.folder.Remove("a.py");
  at.folder.Remove("other");
  EXPECT_TRUE(at.project.Refresh());
  EXPECT_EQ(at.With("total"), (Paths{"sub/c.py", "sub/new.py"}));
  EXPECT_EQ(at.DefiningMember("total"), (Paths{"sub/new.py"}));
  at.folder.Write("sub/notes.txt", "total\n");
  EXPECT_FALSE(at.project.Refresh());
}

TEST(ProjectFiles, SeeNewRules) {
  Changing at;
  at.folder.Write(".git/HEAD", "");
  at.folder.Write(".gitignore", "b.py\n");
  EXPECT_TRUE(at.project.Refresh());
  EXPECT_EQ(at.All(), (Paths{"a.py", "sub/c.py"}));
  at.folder.Write(".gitignore", "sub\n");
  EXPECT_TRUE(at.project.Refresh());
  EXPECT_EQ(at.All(), (Paths{"a.py", "b.py"}));
}

TEST(ProjectFiles, SeeARootThatComes) {
  const TemporaryFolder folder;
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {folder / "later"});
  EXPECT_TRUE(project.All().empty());
  folder.Write("later/a.py", "total\n");
  EXPECT_TRUE(project.Refresh());
  EXPECT_EQ(Below(folder, files, project.WithWords({"total"})), (Paths{"later/a.py"}));
}

TEST(ProjectFiles, SeeWhatChanges) {
  Changing at;
  // Of the same size, and at once: a stamp may be the same.
  at.folder.Write("b.py", "y = 2\n");
  EXPECT_FALSE(at.project.Refresh());
  EXPECT_EQ(at.With("y"), (Paths{"b.py"}));
  EXPECT_TRUE(at.With("x").empty());
  // Larger than its filter was, again and again.
  std::string text;
  for (int i = 0; i < 5; ++i) {
    for (int k = 0; k < 100; ++k)
      text += "self.name_" + std::to_string(i) + "_" + std::to_string(k) + " = " + "total\n";
    at.folder.Write("b.py", text);
    at.project.Refresh();
    EXPECT_EQ(at.DefiningMember("name_" + std::to_string(i) + "_99"), (Paths{"b.py"}));
    EXPECT_EQ(at.With("total"), (Paths{"a.py", "b.py", "sub/c.py"}));
    EXPECT_EQ(at.DefiningMember("total"), (Paths{"a.py"}));
  }
  at.folder.Write("b.py", "");
  at.project.Forget();
  EXPECT_EQ(at.With("total"), (Paths{"a.py", "sub/c.py"}));
}

TEST(ProjectFiles, KeepNoFiltersOfTextsThatAreGone) {
  Changing at;
  std::string words[2];
  for (int i = 0; i < 2000; ++i) words[i % 2] += "name_" + std::to_string(i) + " = total\n";
  at.folder.Write("b.py", words[0] + words[1]);
  at.project.Refresh();
  at.With("total");
  at.With("total");
  const size_t at_first = at.project.ByteSize();
  for (int round = 0; round < 30; ++round) {
    at.folder.Write("new" + std::to_string(round) + ".py", "x = 1\n");
    at.folder.Write("b.py", "");
    at.project.Refresh();
    at.With("total");
    at.folder.Write("b.py", words[0] + words[1] + words[round % 2]);
    at.project.Refresh();
    EXPECT_EQ(at.With("total"), (Paths{"a.py", "b.py", "sub/c.py"}));
  }
  EXPECT_LT(at.project.ByteSize(), 5 * at_first);
}

TEST(ProjectFiles, TakeTheTextOfBuffers) {
  Changing at;
  const FileId b = at.files.NumberOf(at.folder / "b.py");
  const FileId a = at.files.NumberOf(at.folder / "a.py");
  at.files.Open(b, "def amount(): total\n");
  at.files.Open(a, "nothing\n");
  EXPECT_EQ(at.With("total"), (Paths{"b.py", "sub/c.py"}));
  EXPECT_EQ(at.With("nothing"), (Paths{"a.py"}));
  EXPECT_EQ(at.DefiningMember("amount"), (Paths{"b.py"}));
  at.files.Change(b, 4, 10, "number");
  EXPECT_EQ(at.With("number"), (Paths{"b.py"}));
  EXPECT_TRUE(at.With("amount").empty());
  at.files.Open(at.files.NumberOf(at.folder / "none.py"), "total\n");
  EXPECT_TRUE(at.project.Refresh());
  EXPECT_EQ(at.With("total"), (Paths{"b.py", "none.py", "sub/c.py"}));
  for (const FileId buffer : std::vector<FileId>(at.files.Buffers())) at.files.Close(buffer);
  EXPECT_TRUE(at.project.Refresh());
  EXPECT_EQ(at.With("total"), (Paths{"a.py", "sub/c.py"}));
  EXPECT_EQ(at.DefiningMember("total"), (Paths{"a.py"}));
}

TEST(ProjectFiles, AreFoundByWhatIsNoWordAndByNothing) {
  Changing at;
  at.folder.Write("sub/c.py", "total.of 12 \xC3\xA4hnlich\n");
  at.project.Refresh();
  EXPECT_EQ(at.With("total.of"), (Paths{"sub/c.py"}));
  EXPECT_EQ(at.With("12"), (Paths{"sub/c.py"}));
  EXPECT_EQ(at.With("\xC3\xA4hnlich"), (Paths{"sub/c.py"}));
  EXPECT_EQ(Below(at.folder, at.files, at.project.WithWords({})), at.All());
  EXPECT_TRUE(at.DefiningMember("").empty());
}

// A folder of many files with an index of them, that a project may use.
struct Indexed {
  static constexpr size_t kFiles = 90;
  TemporaryFolder folder = {
      {"a.py", "class A:\n  def total(): pass\n"}, {"b.py", "self.total = 1 # cart\n"}, {"c.py", "total()\n"}};
  std::vector<std::string> stored = {"a.py", "b.py", "c.py"};
  NameIndexWriter writer;

  Indexed() {
    for (size_t i = stored.size(); i < kFiles; ++i) {
      stored.push_back("many/m" + std::to_string(i) + ".py");
      folder.Write(stored.back(), "x = " + std::to_string(i) + "\n");
    }
    for (const std::string& path : stored) {
      // What was written just now is read again by the next question.
      const std::filesystem::path file = folder / path;
      std::filesystem::last_write_time(file, std::filesystem::last_write_time(file) - std::chrono::hours(1));
      Add(path, path);
    }
  }
  // What is said of a path is what is in a file.
  void Add(const std::string& path, const std::string& of) {
    static FileAnalyzer file(FileAnalyzer::Options{testing::AnalyzerOptions(testing::kPy3), {}});
    const auto words = MakeWordsWriter(testing::kPy3);
    std::string source, written;
    ASSERT_FALSE(ReadBeginning(folder / of, true, 4096, source).has_value());
    ScopeNames scopes;
    PlacedRecords placed;
    file.Analyze(source, nullptr);
    scopes.Build(file);
    words->Write(BatchInput{path, {}, {}}, file, scopes, placed, written);
    const FileStatus status = *StatusOf(folder / of);
    const auto errors = static_cast<uint32_t>(of == "broken.py");
    ASSERT_TRUE(writer.Add({path, status.size, status.time, 0, 1, 0, errors, ""}, written).has_value());
  }
  // Its bytes, as they are made for a version by something.
  std::string Bytes(Text version = "3.12", Text made_by = "us") {
    return writer.Finish(std::string(version) + std::string("\0001\0", 3) + std::string(made_by) +
                         std::string("\0", 1));
  }
  void WriteIndex(const std::string& bytes) { folder.Write(".quillet-index", bytes); }

  struct Answers {
    Paths with_total, with_cart, defining;
    size_t read_first = 0, read = 0;
  };
  Answers Ask(Text maker = "us", const Paths& roots = {""}) {
    Files files(Version::Of(3, 12));
    Paths whole;
    for (const std::string& root : roots) whole.push_back(folder / root);
    ProjectFiles project(files, whole, "", maker);
    Answers answers;
    answers.with_total = Below(folder, files, project.WithWords({"total"}));
    answers.read_first = project.read_count();
    answers.defining = Below(folder, files, project.DefiningMember("total"));
    answers.with_cart = Below(folder, files, project.WithWords({"cart"}));
    answers.read = project.read_count();
    return answers;
  }
};

TEST(ProjectFiles, ReadNothingThatAnIndexKnows) {
  Indexed at;
  const Indexed::Answers without = at.Ask();
  EXPECT_EQ(without.with_total, (Paths{"a.py", "b.py", "c.py"}));
  EXPECT_EQ(without.defining, (Paths{"a.py", "b.py"}));
  EXPECT_EQ(without.with_cart, (Paths{"b.py"})) << "in a comment";
  EXPECT_EQ(without.read_first, Indexed::kFiles);
  at.WriteIndex(at.Bytes());
  const Indexed::Answers with = at.Ask();
  EXPECT_EQ(with.with_total, without.with_total);
  EXPECT_EQ(with.defining, without.defining);
  EXPECT_LE(with.read_first, 5u);
  EXPECT_LE(with.read, 12u);
  EXPECT_LE(at.Ask("us", {"many", ""}).read_first, 5u) << "of another root";
  EXPECT_EQ(at.Ask("us", {"many"}).read_first, Indexed::kFiles - 3) << "that of a root alone";
}

// Where lines do not tell, what is defined by anything counts.
TEST(ProjectFiles, TellMembersFromOtherDefinitions) {
  const TemporaryFolder folder = {
      {"body.py", "class Cart:\n    if shop:\n        total: int = 1\n"},
      {"given.py", "def fill(self):\n    self.total = 1\n"},
      {"method.py", "class Cart:\n    def total(self): pass\n"},
      {"nested.py", "def fill():\n    class Cart:\n        total = 1\n"},
      {"untold.py", "class Cart:\n    def fill(self):\n        total = '\n"},
      {"function.py", "def total(): pass\n"},
      {"local.py", "class Cart:\n    def fill(self, total=1):\n        total = self.total\n"},
      {"mentioned.py", "class Cart:\n    '''\n    total: of all\n    '''\n"},
      {"module.py", "total = 1\nclass Cart: pass\n"},
      {"read.py", "class Cart:\n    def fill(self):\n        for item in self.total: pass\n"},
      {"slots.py", "class Cart:\n    __slots__ = ('total',)\n"},
  };
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {folder.path()});
  const auto defining = [&](Text name) { return Below(folder, files, project.DefiningMember(name)); };
  EXPECT_EQ(defining("total").size(), 11u) << "searched, as there are no filters yet";
  EXPECT_EQ(defining("total"), (Paths{"body.py", "given.py", "method.py", "nested.py", "untold.py"}));
  EXPECT_EQ(Below(folder, files, project.DefiningMember("total", "Cart")),
            (Paths{"body.py", "method.py", "nested.py", "slots.py", "untold.py"}));
  EXPECT_TRUE(project.DefiningMember("total", "Shop").empty());
}

TEST(ProjectFiles, AreGivenOneAfterTheOtherUntilThereAreEnough) {
  Indexed at;
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {at.folder.path()});
  for (int round = 0; round < 2; ++round) {
    std::vector<FileId> found;
    const size_t before = project.read_count();
    project.EachWithWord("total", [&](FileId file) {
      found.push_back(file);
      return found.size() < 2;
    });
    EXPECT_EQ(Below(at.folder, files, found), (Paths{"a.py", "b.py"}));
    if (round == 0) {
      EXPECT_EQ(project.read_count() - before, 2u);
    }
    found.clear();
    project.EachWithWord("total", [&](FileId file) {
      found.push_back(file);
      return true;
    });
    EXPECT_EQ(found, project.WithWords({"total"}));
  }
}

TEST(ProjectFiles, ReadWhatIsNotAsAnIndexKnowsIt) {
  Indexed at;
  at.folder.Write("broken.py", "x = (1\n");
  at.Add("broken.py", "broken.py");
  at.WriteIndex(at.Bytes());
  at.folder.Write("many/m7.py", "x = total\n");
  const auto old = std::filesystem::last_write_time(at.folder / "many/m8.py");
  at.folder.Write("many/m8.py", "total\n");  // of the same size
  std::filesystem::last_write_time(at.folder / "many/m8.py", old + std::chrono::seconds(1));
  at.folder.Write("new.py", "total\n");
  at.folder.Remove("c.py");
  const Indexed::Answers with = at.Ask();
  EXPECT_EQ(with.with_total, (Paths{"a.py", "b.py", "many/m7.py", "many/m8.py", "new.py"}));
  EXPECT_GE(with.read_first, 4u);
  EXPECT_LE(with.read_first, 8u);

  // A buffer is searched, whatever the file is.
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {at.folder.path()}, "", "us");
  files.Open(files.NumberOf(at.folder / "a.py"), "nothing\n");
  files.Open(files.NumberOf(at.folder / "many/m9.py"), "total\n");
  EXPECT_EQ(Below(at.folder, files, project.WithWords({"total"})),
            (Paths{"b.py", "many/m7.py", "many/m8.py", "many/m9.py", "new.py"}));

  // What changes behind the first question is seen.
  at.folder.Write("b.py", "nothing at all\n");
  project.Refresh();
  EXPECT_EQ(Below(at.folder, files, project.WithWords({"total"})),
            (Paths{"many/m7.py", "many/m8.py", "many/m9.py", "new.py"}));
}

TEST(ProjectFiles, AskNoIndexForLongWords) {
  Indexed at;
  const std::string name(kMaxWordSize + 20, 'n');
  at.folder.Write("long.py", name + " = 1\n");
  at.Add("long.py", "long.py");
  at.WriteIndex(at.Bytes());
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {at.folder.path()}, "", "us");
  for (int i = 0; i < 2; ++i) {
    EXPECT_EQ(Below(at.folder, files, project.WithWords({name})), (Paths{"long.py"}));
    EXPECT_EQ(Below(at.folder, files, project.DefiningMember(name)), (Paths{"long.py"}));
    EXPECT_TRUE(project.WithWords({Text(name).substr(1)}).empty());
  }
}

TEST(ProjectFiles, UseNoIndexThatDoesNotFit) {
  Indexed at;
  const std::string fine = at.Bytes();
  const auto expect_unused = [&](const char* why, Text maker = "us") {
    const Indexed::Answers answers = at.Ask(maker);
    EXPECT_EQ(answers.with_total, (Paths{"a.py", "b.py", "c.py"})) << why;
    EXPECT_EQ(answers.read_first, Indexed::kFiles) << why;
  };
  at.WriteIndex(fine);
  ASSERT_LE(at.Ask().read_first, 5u);
  expect_unused("none is wanted", "");
  expect_unused("made by something else", "others");
  for (size_t size : {0, 5, 12, 16, 23, 24, 100}) {
    at.WriteIndex(fine.substr(0, size));
    expect_unused("cut off");
  }
  for (size_t i = 0; i < fine.size(); i += 61) {
    std::string damaged = fine;
    damaged[i] = static_cast<char>(damaged[i] ^ 0x41);
    at.WriteIndex(damaged);
    expect_unused("damaged");
  }
  at.WriteIndex("SQLite format 3");
  expect_unused("something else");
  at.WriteIndex(at.Bytes("3.11"));
  expect_unused("of another version");
  at.folder.Remove(".quillet-index");
  at.folder.Write("elsewhere", fine);
  at.folder.Link("elsewhere", ".quillet-index");
  expect_unused("a link");
  at.folder.Remove(".quillet-index");
  at.folder.Write(".quillet-index/file", fine);
  expect_unused("a folder");
}

TEST(ProjectFiles, FollowNoPathOfAnIndex) {
  Indexed at;
  const TemporaryFolder other = {{"secret.py", "total\n"}};
  for (const std::string& path : {other / "secret.py", "../" + std::string(other.path().substr(5)) + "/secret.py",
                                  std::string("many/../a.py"), std::string("gone.py")})
    at.Add(path, "a.py");
  at.WriteIndex(at.Bytes());
  const Indexed::Answers with = at.Ask();
  EXPECT_EQ(with.with_total, (Paths{"a.py", "b.py", "c.py"}));
  EXPECT_LE(with.read_first, 5u);
}

// Whether a source may define a name, by its keys.
bool Defines(std::string source, Text name) {
  const std::string before = source;
  WordKeys keys;
  keys.Read(source);
  EXPECT_EQ(source, before);
  EXPECT_FALSE(keys.may_define_any()) << source;
  return std::ranges::count(keys.keys(), KeyOfDefinition(name)) == 1;
}

TEST(WordKeys, TellDefinitionsFromOtherWords) {
  for (const char* source : {"def n(): pass",
                             "async def  n(a): pass",
                             "class n: pass",
                             "class \\\n n(B): pass",
                             "n = 1",
                             "n=1",
                             "self.n = 1",
                             "  a.b.n  = 1",
                             "n += 1",
                             "self.n **= 2",
                             "n >>= 2",
                             "n //= 2",
                             "n: int",
                             "self.n: int = 3",
                             "(n := 1)",
                             "a = n = 2",
                             "a, n = 1, 2",
                             "n, a = 1, 2",
                             "n, = a",
                             "self.n, self.a = 1, 2",
                             "(a, n) = 1, 2",
                             "[n, a] = 1, 2",
                             "a, (n, b) = c",
                             "(\n  n,\n  b,\n) = c",
                             "a, \\\n n = c",
                             "n, \\\n a = c",
                             "n, \\\r\n a = c",
                             "*n, a = c",
                             "n, x['('] = c",
                             "n, x[0] = c",
                             "x(1).n, a = c",
                             "if a: n, b = c",
                             "a = 1; n, b = c",
                             "for n in c: pass",
                             "  for a, (n, b) in c: pass",
                             "async for n in c: pass",
                             "for self.n in c: pass",
                             "with c as n: pass",
                             "with c as self.n, d as e: pass",
                             "with c as (n, e): pass",
                             "import a as n",
                             "except E as n:",
                             "except E, n:",
                             "type n = int",
                             "type n[T] = list[T]",
                             "n \\\n = 1"})
    EXPECT_TRUE(Defines(source, "n")) << source;
  for (const char* source :
       {"n",       "n()",       "n == 1",     "a = n",       "n.a = 1",        "n <= 1",   "n >= 1",   "n != 1",
        "f(n, a)", "n[0] = 1",  "n(1).a = 1", "a, b = n, c", "[a for n in c]", "import n", "return n", "na = 1",
        "an: int", "a(n, b=1)", "defn",       "a.n\nb = 2",  "n,\nb = 2",      ""})
    EXPECT_FALSE(Defines(source, "n")) << source;
}

TEST(WordKeys, TellAttributesThatAreGivenSomething) {
  const auto is_attribute = [](std::string source) {
    WordKeys keys;
    keys.Read(source);
    return std::ranges::count(keys.attributes(), KeyOfMember("n")) > 0;
  };
  for (const char* source :
       {"self.n = 1", "a.b.n += 1", "a.n: int", "  a.n: int = 3", "if b: a.n: int", "b; a.n: int", "a . n = 1",
        "(a.\n n) = 1", "a.\\\n n = 1", "b, a[0].n = c", "f(x).n = 1", "for a.n in c: pass", "with c as a.n: pass"})
    EXPECT_TRUE(is_attribute(source)) << source;
  for (const char* source : {"n = 1", "n: int", "def n(): pass", "class n: pass", "if a.n: pass", "for b in a.n: pass",
                             "while not a.n: pass", "b[a.n:]", "a.n == 1", "f(a.n, b=1)", "a.n.b = 1", "a.n"})
    EXPECT_FALSE(is_attribute(source)) << source;
}

TEST(WordKeys, HoldEveryWordWhereverItStands) {
  WordKeys keys;
  for (size_t size = 1; size < 70; ++size) {
    for (const size_t before : {0, 1, 7, 58, 59, 62, 63, 64, 65, 127, 128}) {
      const std::string word(size, 'w');
      std::string source = std::string(before, '.') + word;
      keys.Read(source);
      EXPECT_EQ(keys.keys(), std::vector<WordKey>{KeyOfWord(word)}) << size << " " << before;
      source += " = 12";
      keys.Read(source);
      EXPECT_EQ(keys.keys(), (std::vector<WordKey>{KeyOfWord(word), KeyOfDefinition(word)})) << size << " " << before;
    }
  }
}

TEST(WordKeys, AreBoundedWhereTargetsDoNotEnd) {
  std::string source;
  for (int i = 0; i < 100'000; ++i) source += ")=";
  WordKeys keys;
  keys.Read(source);
  EXPECT_TRUE(keys.may_define_any());
  // What defines anything is asked for the word.
  const TemporaryFolder folder = {{"b.py", "x"}};
  folder.Write("a.py", "name" + source);
  Files files(Version::Of(3, 12));
  ProjectFiles project(files, {folder.path()});
  EXPECT_EQ(Below(folder, files, project.DefiningMember("name")), (Paths{"a.py"}));
}

TEST(WordFilters, HoldTheirKeysAndFewOthers) {
  std::vector<WordKey> keys;
  for (int i = 0; i < 1000; ++i) keys.push_back(KeyOfWord("word" + std::to_string(i)));
  std::vector<uint64_t> bits = {0};  // of another one
  AppendFilter(keys, bits);
  int others = 0;
  for (int i = 0; i < 10000; ++i) {
    const bool may_hold = MayHold(bits.data() + 1, bits.size() - 1, KeyOfWord("word" + std::to_string(i)));
    EXPECT_TRUE(may_hold || i >= 1000) << i;
    others += i >= 1000 && may_hold;
  }
  EXPECT_LT(others, 90);
  EXPECT_FALSE(MayHold(bits.data(), 0, keys[0]));
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
