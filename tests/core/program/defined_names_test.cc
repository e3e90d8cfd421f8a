// What files define, by name, and when it is read again.
#include "program/defined_names.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/core/support/temporary_folder.h"

namespace quillet {
namespace {

using testing::TemporaryFolder;
using Words = std::vector<std::string>;

// `scope.name` with a mark for what it is.
Words Of(DefinedNames& names, FileId file) {
  names.Read({{file}});
  Words words;
  for (const DefinedNames::Definition& definition : names.Of(file)) {
    std::string word;
    if (definition.scope != kNoIndex) word = std::string(names.TextOf(definition.scope)) + ".";
    word += names.TextOf(definition.name);
    if (definition.kind != NameKind::kNone)
      word += " " + std::string(NameKindWords()[static_cast<size_t>(definition.kind) - 1]);
    if (definition.is_symbol) word += " symbol";
    if (definition.in_class) word += " member";
    if (definition.of_self) word += " of self";
    words.push_back(word);
  }
  return words;
}

TEST(DefinedNames, AreThoseOfModulesClassesAndSelf) {
  const TemporaryFolder folder = {{"a.py",
                                   "import os\n"
                                   "x = 1\n"
                                   "x = 2\n"
                                   "def f(given):\n"
                                   "    local = y\n"
                                   "    def inner(): pass\n"
                                   "class A:\n"
                                   "    z, z2 = 1, 2\n"
                                   "    def m(self, other):\n"
                                   "        self.p = other.q = 3\n"
                                   "        self.p += 1\n"
                                   "        self.r: int\n"
                                   "y = 1\n"}};
  Files files(Version::Of(3, 12));
  DefinedNames names(files);
  const FileId a = files.NumberOf(folder / "a.py");
  EXPECT_EQ(Of(names, a),
            (Words{"x variable symbol", "x variable", "f function symbol", "f.inner function symbol", "A class symbol",
                   "A.z variable symbol member", "A.z2 variable symbol member", "A.m function symbol member",
                   "A.m.p of self", "A.m.p of self", "A.m.r of self", "y variable symbol"}));
  EXPECT_FALSE(files.IsHeld(a));
  EXPECT_NE(names.Find("z2"), kNoIndex);
  EXPECT_EQ(names.Find("local"), kNoIndex);
  EXPECT_EQ(names.Find(""), kNoIndex);
  EXPECT_EQ(Of(names, files.NumberOf(folder / "nothing.py")), Words{});
}

TEST(DefinedNames, AreReadAgainWhereFilesChanged) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}, {"b.py", "b = 1\n"}};
  Files files(Version::Of(3, 12));
  DefinedNames names(files);
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId b = files.NumberOf(folder / "b.py");
  EXPECT_EQ(Of(names, a), Words{"x variable symbol"});
  EXPECT_EQ(Of(names, b), Words{"b variable symbol"});
  folder.Write("a.py", "y, z = 1\n");
  EXPECT_EQ(Of(names, a), Words{"x variable symbol"}) << "until it is told to look";
  names.Forget();
  EXPECT_EQ(Of(names, a), (Words{"y variable symbol", "z variable symbol"}));
  folder.Write("a.py", "v, w = 1\n");  // as long, and in the same moment
  names.Forget();
  EXPECT_EQ(Of(names, a), (Words{"v variable symbol", "w variable symbol"}));
  folder.Remove("a.py");
  names.Forget();
  EXPECT_EQ(Of(names, a), Words{});
  EXPECT_EQ(Of(names, b), Words{"b variable symbol"});
}

TEST(DefinedNames, AreThoseOfBuffers) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}};
  Files files(Version::Of(3, 12));
  DefinedNames names(files);
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId new_one = files.NumberOf(folder / "new.py");
  EXPECT_EQ(Of(names, a), Words{"x variable symbol"});
  files.Open(a, "class B: pass\n");
  files.Open(new_one, "def f(): pass\n");
  names.Forget();
  EXPECT_EQ(Of(names, a), Words{"B class symbol"});
  EXPECT_EQ(Of(names, new_one), Words{"f function symbol"});
  files.Change(a, 6, 7, "C");
  EXPECT_EQ(Of(names, a), Words{"C class symbol"}) << "without being told to look";
  files.Close(a);
  files.Close(new_one);
  names.Forget();
  EXPECT_EQ(Of(names, a), Words{"x variable symbol"});
  EXPECT_EQ(Of(names, new_one), Words{});
}

TEST(DefinedNames, AreTheSameFromTwoThreads) {
  const TemporaryFolder folder;
  Files files(Version::Of(3, 12));
  std::vector<FileId> all;
  for (int i = 0; i < 100; ++i) {
    const std::string number = std::to_string(i);
    folder.Write("m" + number + ".py", "def shared(): pass\nclass C" + number + ":\n  def own" + number + "(): pass\n");
    folder.Write("m" + number + ".pyi", "def stub" + number + "(): ...\n");
    all.push_back(files.NumberOf(folder / ("m" + number + ".py")));
    all.push_back(files.NumberOf(folder / ("m" + number + ".pyi")));
  }
  DefinedNames names(files);
  names.Read(all);
  const size_t size = names.text_count();
  for (size_t i = 0; i < 100; ++i) {
    const std::string number = std::to_string(i);
    EXPECT_EQ(Of(names, all[2 * i]), (Words{"shared function symbol", "C" + number + " class symbol",
                                            "C" + number + ".own" + number + " function symbol member"}));
    EXPECT_EQ(Of(names, all[2 * i + 1]), Words{"stub" + number + " function symbol"});
  }
  EXPECT_EQ(names.text_count(), size);
  EXPECT_EQ(names.Of(all[0])[0].name, names.Of(all[2])[0].name);
}

// Whether a file with such a text is read for the member `x`.
bool IsReadForX(std::string_view text) {
  const std::string source = std::string(text) + "\ndef other(): pass\n";
  const TemporaryFolder folder;
  folder.Write("a.py", source);
  Files files(Version::Of(3, 12));
  const FileId file = files.NumberOf(folder / "a.py");
  DefinedNames names(files);
  names.ReadForMember({{file}}, "x");
  const bool is_read = !names.Of(file).empty();
  // What was kept of other questions changes nothing.
  DefinedNames others(files);
  others.ReadForMember({{file}}, "other");
  others.ReadPossible({{file}});
  others.ReadForMember({{file}}, "x");
  EXPECT_EQ(!others.Of(file).empty(), is_read) << text;
  EXPECT_TRUE(!is_read || names.MayDefineMember(file, "x")) << text;
  return is_read;
}

TEST(DefinedNames, AreReadForAMemberWhereItMayBeDefined) {
  for (const char* text : {"class A:\n  x = 1",
                           "class A: x = 1",
                           "class A:\n  y, x = 1, 2",
                           "class A:\n  def x(self): pass",
                           "class A:\n  class x: pass",
                           "class A:\n  if y:\n    x: int",
                           "class A:\n  for x in y: pass",
                           "class A:\n  with y as x: pass",
                           "class A:\n  y = 'def'\n  x = 1",
                           "class A:\n\ty = 1\n        x = 1",
                           "class A:\n  y = \"\"\"\ndef f():\n  z\n\"\"\"\n  x = 1",
                           "class A:\n  y = [\n1,\n]\n  x = 1",
                           "class A:\n  def f(self): pass\n  x = 1",
                           "class A:\n  y = 1\n\f\n  x = 1",
                           "def f():\n  class A:\n    x = 1",
                           "class A:\n  def f(self):\n    self.x = 1",
                           "class A:\n  def f(self):\n    y, self.x = 1, 2",
                           "class A:\n  def f(self):\n    self.x += 1",
                           "class A:\n  def f(self):\n    self.x: int",
                           "class A:\n  def f(self):\n    for self.x in y: pass",
                           "class A:\n  def f(self):\n    with y as self.x, z: pass",
                           "class A:\n  def f(self):\n    with y as (\n      z,\n      self.x): pass",
                           "class A:\n  def f(self):\n    if y: self.x: int",
                           "class A:\n  def f(self):\n    self . x = 1",
                           "class A:\n  def f(self):\n    self.x, \\\n      y = 1, 2",
                           "class A:\n  def f(self):\n    [self.x,  # the first\n     y] = 1, 2",
                           "class A:\n  def f(self, y=(x := 1)): pass",
                           "class A:\n  def f(self):\n    (y,\n     self.x\n    ) = 1, 2"}) {
    EXPECT_TRUE(IsReadForX(text)) << text;
  }
}

TEST(DefinedNames, AreNotReadForAMemberThatIsPlainlyNone) {
  for (const char* text :
       {"x = 1", "def x(): pass", "def f(x): x = 1", "def f():\n  x = 1", "class A:\n  def f(self):\n    x = 1",
        "class A:\n  def f(self,\n        x=1): pass", "class A:\n  def f(self, x, *, y=x): pass",
        "class A:\n  '\"'\n  \"\"\"Of x\n  x = 1\n  \"\"\"\n  # x = 1\n  y = f(x=1)",
        "class A:\n  def f(self):\n    y = g(self.x)\n    z = 1",
        "class A:\n  def f(self):\n    return (self.x,\n            y)",
        "class A:\n  def f(self):\n    self.x()\n    x.y = self.x.y",
        "class A:\n  def f(self):\n    y.x = 1\n    self.x == 1",
        "class A:\n  def f(self):\n    'x'\n    return self.x + 1",
        "def f():\n  \"\"\"Of x.\"\"\"\n  if y:\n    x = 1"}) {
    EXPECT_FALSE(IsReadForX(text)) << text;
  }
}

}  // namespace
}  // namespace quillet
