// The files of a workspace: their numbers, when they are read again, buffers, encodings and what is held.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <string>
#include <vector>

#include "program/files.h"
#include "tests/core/support/temporary_folder.h"

namespace quillet {
namespace {

using testing::TemporaryFolder;

TEST(Files, HaveOneNumberForAPath) {
  Files files(Version::Of(3, 12));
  const FileId file = files.NumberOf("/a/b.py");
  for (const Text same : {"/a/./b.py", "/a//b.py", "/x/../a/b.py", "/../a/b.py", "/a/b.py/"})
    EXPECT_EQ(files.NumberOf(same), file) << same;
  EXPECT_NE(files.NumberOf("/a/c.py"), file);
  EXPECT_EQ(files.PathOf(file), "/a/b.py");
  EXPECT_TRUE(files.PathOf(files.NumberOf("b.py")).ends_with("/b.py"));
  EXPECT_EQ(files.PathOf(files.NumberOf("/..")), "/");
}

TEST(Files, SayWhatIsHeldOfAStamp) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const FileStamp stamp = StampOf(folder / "a.py");
  EXPECT_EQ(files.HeldAs(a, stamp), nullptr);
  const SourceFile* held = files.Get(a);
  EXPECT_EQ(files.HeldAs(a, stamp), held);
  folder.Write("a.py", "x, y = 1, 2\n");
  EXPECT_EQ(files.HeldAs(a, StampOf(folder / "a.py")), nullptr);
  files.Open(a, "z = 1\n");
  EXPECT_EQ(files.HeldAs(a, stamp), nullptr);
  held = files.Get(a);
  EXPECT_EQ(files.HeldAs(a, {}), held);
}

TEST(Files, AreReadAgainWhereTheyChanged) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}, {"b.py", "y = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId b = files.NumberOf(folder / "b.py");
  const FileId c = files.NumberOf(folder / "c.py");
  const SourceFile* first = files.Get(a);
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(first->text(), "x = 1\n");
  EXPECT_EQ(first->path, folder / "a.py");
  EXPECT_EQ(first->bindings.occurrences.size(), 1u);
  EXPECT_EQ(files.Get(a), first);
  EXPECT_NE(files.Get(b), nullptr);
  EXPECT_EQ(files.Get(c), nullptr);
  EXPECT_FALSE(files.Exists(c));
  EXPECT_FALSE(files.Refresh());

  folder.Write("a.py", "x, z = 1, 2\n");
  EXPECT_EQ(files.Get(a), first);
  EXPECT_TRUE(files.Refresh());
  EXPECT_EQ(files.Get(a)->text(), "x, z = 1, 2\n");
  folder.Write("c.py", "");
  EXPECT_TRUE(files.Refresh());
  EXPECT_TRUE(files.Exists(c));
  EXPECT_NE(files.Get(c), nullptr);
  folder.Remove("a.py");
  EXPECT_TRUE(files.Refresh());
  EXPECT_EQ(files.Get(a), nullptr);
}

TEST(Files, StayWhereTheyAreOnlyWrittenAnew) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const SourceFile* first = files.Get(a);
  folder.Remove("a.py");
  folder.Write("b.py", "");  // takes the number of the file that went
  folder.Write("a.py", "x = 1\n");
  const timespec times[2] = {{1000, 0}, {1000, 5}};
  ASSERT_EQ(utimensat(AT_FDCWD, (folder / "a.py").c_str(), times, 0), 0);
  EXPECT_FALSE(files.Refresh());
  EXPECT_EQ(files.Get(a), first);
}

TEST(Files, GiveWayToBuffers) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId b = files.NumberOf(folder / "b.py");
  const SourceFile* first = files.Get(a);
  files.Open(a, "x = 1\n");
  EXPECT_EQ(files.Get(a), first);
  files.Open(a, "y = 2\n");
  EXPECT_EQ(files.Get(a)->text(), "y = 2\n");
  files.Change(a, 0, 1, "long_name");
  EXPECT_EQ(files.Get(a)->text(), "long_name = 2\n");
  EXPECT_EQ(files.Get(a)->bindings.TextOf(files.Get(a)->bindings.occurrences[0]), "long_name");
  files.Change(a, 1000, 5, "# end");
  EXPECT_EQ(files.Get(a)->text(), "long_name = 2\n# end");
  EXPECT_TRUE(files.IsOpen(a));
  EXPECT_FALSE(files.Refresh());
  files.Close(a);
  EXPECT_FALSE(files.IsOpen(a));
  EXPECT_EQ(files.Get(a)->text(), "x = 1\n");
  files.Close(a);

  EXPECT_EQ(files.Get(b), nullptr);
  files.Open(b, "z = 1\n");
  EXPECT_TRUE(files.Exists(b));
  EXPECT_EQ(files.Get(b)->text(), "z = 1\n");
  files.Close(b);
  EXPECT_FALSE(files.Exists(b));
  EXPECT_EQ(files.Get(b), nullptr);
  files.Change(a, 0, 0, "# ");
  EXPECT_EQ(files.Get(a)->text(), "# x = 1\n");
}

TEST(Files, AreTheSameBehindBeingGivenBack) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}, {"b.py", "y = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId b = files.NumberOf(folder / "b.py");
  files.Get(a);
  files.Get(b);
  const size_t both = files.ByteSize();
  files.GiveBack(b);
  EXPECT_FALSE(files.IsHeld(b));
  EXPECT_TRUE(files.IsHeld(a));
  EXPECT_LT(files.ByteSize(), both);
  EXPECT_FALSE(files.Refresh());
  EXPECT_EQ(files.Get(b)->text(), "y = 1\n");
  EXPECT_EQ(files.ByteSize(), both);

  files.Get(a);
  files.Trim(both - 1);
  EXPECT_FALSE(files.IsHeld(b)) << "asked for before the other";
  EXPECT_TRUE(files.IsHeld(a));
  folder.Remove("b.py");
  folder.Write("b.py", "y = 1\n");
  EXPECT_FALSE(files.Refresh()) << "only written anew";
  folder.Write("b.py", "y = 2 + 3\n");
  EXPECT_TRUE(files.Refresh());
  EXPECT_EQ(files.Get(b)->text(), "y = 2 + 3\n");

  files.Open(a, "z = 1\n");
  files.Get(a);
  files.GiveBack(a);
  files.Trim(0);
  EXPECT_TRUE(files.IsHeld(a)) << "a buffer";
}

TEST(Files, SayThatTheyChangedWhereOthersWouldBeMeant) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}, {"b.py", "y = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId b = files.NumberOf(folder / "b.py");
  files.Get(a);
  files.Get(b);
  files.Trim(0);
  folder.Write("a.py", "y = 1\n");  // as long as it was
  folder.Remove("b.py");
  EXPECT_THROW(files.Get(a), SourceChanged);
  EXPECT_THROW(files.PlaceOf(a, 0), SourceChanged);
  EXPECT_THROW(files.Get(b), SourceChanged);
  EXPECT_TRUE(files.Refresh());
  EXPECT_EQ(files.Get(a)->text(), "y = 1\n");
  EXPECT_EQ(files.Get(b), nullptr);
  EXPECT_FALSE(files.Refresh());
}

TEST(Files, KnowPlacesWithoutBeingHeld) {
  const TemporaryFolder folder;
  for (const Text source :
       {Text("x = 1\ny = 2\r\n\r\rz = 3\n\n"), Text("\xEF\xBB\xBFx\n  y\n"), Text(""), Text("\n")}) {
    folder.Write("a.py", std::string(source));
    Files files(Version::Of(3, 12));
    const FileId a = files.NumberOf(folder / "a.py");
    std::vector<Position> places;
    for (uint32_t at = 0; at <= source.size(); ++at) places.push_back(files.PlaceOf(a, at));
    EXPECT_FALSE(files.IsHeld(a));
    const SourceFile* file = files.Get(a);
    for (uint32_t at = 0; at <= source.size(); ++at) {
      const Position place = file->PlaceOf(at);
      EXPECT_EQ(places[at].line, place.line) << at;
      EXPECT_EQ(places[at].col, place.col) << at;
    }
  }
}

TEST(Files, AreReadByTheirKindAndVersion) {
  const TemporaryFolder folder = {{"a.py", "print 'x', y\n"}, {"a.pyi", "x: int\n"}};
  Files files(Version::Of(2, 7));
  const SourceFile* source = files.Get(files.NumberOf(folder / "a.py"));
  const SourceFile* stub = files.Get(files.NumberOf(folder / "a.pyi"));
  EXPECT_TRUE(source->is_python2 && source->bindings.is_python2 && !source->is_stub);
  EXPECT_TRUE(!stub->is_python2 && !stub->bindings.is_python2 && stub->is_stub);
}

TEST(Files, AreDecoded) {
  const TemporaryFolder folder = {{"a.py", "# coding: latin-1\ns = '\xE4'\n"}, {"b.py", "s = '\xC3\xA4'\n"}};
  Files files(Version::Of(3, 12));
  EXPECT_EQ(files.Get(files.NumberOf(folder / "a.py"))->text(), "# coding: latin-1\ns = '\xC3\xA4'\n");
  EXPECT_EQ(files.Get(files.NumberOf(folder / "b.py"))->text(), "s = '\xC3\xA4'\n");
  SetSourceDecoder([](Text, std::string& utf8) {
    utf8 = "decoded = 1\n";
    return true;
  });
  Files others(Version::Of(3, 12));
  EXPECT_EQ(others.Get(others.NumberOf(folder / "a.py"))->text(), "decoded = 1\n");
  EXPECT_TRUE(others.Holds(others.NumberOf(folder / "a.py"), "decoded"));
  SetSourceDecoder(nullptr);
}

TEST(Files, AreNothingThatWouldBeWaitedFor) {
  const TemporaryFolder folder = {{"a/b.py", ""}};
  ASSERT_EQ(mkfifo((folder / "pipe.py").c_str(), 0600), 0);
  Files files(Version::Of(3, 12));
  for (const char* path : {"pipe.py", "a", "a/b.py/c.py", "nothing"}) {
    const FileId file = files.NumberOf(folder / path);
    EXPECT_FALSE(files.Exists(file)) << path;
    EXPECT_EQ(files.Get(file), nullptr) << path;
    EXPECT_FALSE(files.Holds(file, "a")) << path;
  }
  EXPECT_EQ(files.Get(files.NumberOf(Text("/a\0b", 4))), nullptr);
}

TEST(Files, AreDroppedWhereTheyTakeTooMuch) {
  const TemporaryFolder folder = {{"a.py", "x = 1\n"}, {"b.py", "y = 1\n"}, {"c.py", "z = 1\n"}};
  Files files(Version::Of(3, 12));
  const FileId a = files.NumberOf(folder / "a.py");
  const FileId b = files.NumberOf(folder / "b.py");
  const FileId c = files.NumberOf(folder / "c.py");
  files.Open(c, "z = 2\n");
  const SourceFile* const first = files.Get(a);
  const size_t one = files.ByteSize();
  EXPECT_GE(one, sizeof(SourceFile));
  files.Get(b);
  const SourceFile* const buffer = files.Get(c);
  files.Get(a);
  files.Trim(files.ByteSize());
  EXPECT_GT(files.ByteSize(), 2 * one);
  files.Trim(files.ByteSize() - 1);
  EXPECT_EQ(files.Get(a), first);  // asked for later than b
  files.Trim(0);
  EXPECT_EQ(files.Get(c), buffer);
  EXPECT_LT(files.ByteSize(), 2 * one);
  EXPECT_EQ(files.Get(b)->text(), "y = 1\n");
}

}  // namespace
}  // namespace quillet
