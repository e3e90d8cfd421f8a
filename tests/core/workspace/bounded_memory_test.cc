// Answers of workspaces that may hold next to nothing: those of any other, however often files are read again.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/core/support/temporary_folder.h"
#include "workspace/questions.h"

namespace quillet {
namespace {

using testing::TemporaryFolder;

constexpr int kUsers = 20;

// A class of many users, each of which derives from it and hands its objects on.
void WriteUsers(const TemporaryFolder& folder) {
  folder.Write("shop.py", "class Shop:\n    def total(self): return 1\n    def itself(self): return self\n");
  for (int i = 0; i < kUsers; ++i) {
    const std::string number = std::to_string(i);
    const std::string before = i == 0 ? "shop" : "user" + std::to_string(i - 1);
    folder.Write("user" + number + ".py", "from " + before + " import *\nfrom shop import Shop\nclass User" + number +
                                              "(Shop):\n    def total(self): return Shop().itself().total()\n" +
                                              "def f(given):\n    given.total()\nf(User" + number + "())\n");
  }
}

Workspace::Settings SettingsOf(const TemporaryFolder& folder, size_t most) {
  Workspace::Settings settings;
  settings.roots = {folder.path()};
  settings.version = Version::Of(3, 12);
  settings.most_held = settings.most_visited = settings.most_remembered = most;
  return settings;
}

std::string TextOf(Workspace& workspace, const Location& at) {
  const Position place = workspace.PlaceOf(at.file, at.begin);
  return workspace.PathOf(at.file) + ":" + std::to_string(place.line) + ":" + std::to_string(place.col) + " " +
         std::string(WordOf(at.certainty));
}

std::vector<std::string> Ask(Workspace& workspace, const TemporaryFolder& folder) {
  const FileId shop = workspace.FileOf(folder / "shop.py");
  const FileId user = workspace.FileOf(folder / "user7.py");
  const auto total = [&] { return workspace.OffsetOf(shop, 2, 9); };
  std::vector<std::string> answer;
  const auto add = [&](const std::vector<Location>& locations) {
    for (const Location& location : locations) answer.push_back(TextOf(workspace, location));
  };
  for (int again = 0; again < 2; ++again) {
    add(workspace.References(shop, total()));
    add(workspace.Subtypes(shop, total()));
    add(workspace.Subtypes(shop, workspace.OffsetOf(shop, 1, 7)));
    add(workspace.Definitions(user, workspace.OffsetOf(user, 6, 11)));
    for (const Call& call : workspace.Callers(shop, total())) answer.push_back(call.name);
    for (const std::string& type : workspace.Types(user, workspace.OffsetOf(user, 6, 5))) answer.push_back(type);
    for (const Completion& completion : workspace.Complete(user, workspace.OffsetOf(user, 6, 11)))
      answer.push_back(completion.name);
    for (const TextEdit& edit : workspace.RenameTo(shop, total(), "sum", false).edits)
      answer.push_back(workspace.PathOf(edit.file) + ":" + std::to_string(edit.begin));
  }
  return answer;
}

TEST(BoundedMemory, ChangesNoAnswer) {
  const TemporaryFolder folder;
  WriteUsers(folder);
  Workspace plenty(SettingsOf(folder, size_t{1} << 30));
  const std::vector<std::string> wanted = Ask(plenty, folder);
  ASSERT_GT(wanted.size(), size_t{5 * kUsers});
  EXPECT_GT(plenty.ByteSize(), size_t{kUsers} << 10);
  for (const size_t most : {size_t{0}, size_t{4} << 10, size_t{20} << 10}) {
    Workspace workspace(SettingsOf(folder, most));
    EXPECT_EQ(Ask(workspace, folder), wanted) << most;
    EXPECT_LT(workspace.ByteSize(), plenty.ByteSize()) << most;
  }
}

// Questions that come so fast that files are not looked at in between meet sources that are not what they were.
TEST(BoundedMemory, HoldsAnswersToTheFilesAsTheyAre) {
  const TemporaryFolder folder;
  WriteUsers(folder);
  Workspace workspace(SettingsOf(folder, 0));
  const FileId shop = workspace.FileOf(folder / "shop.py");
  const auto references = [&](uint32_t line, uint32_t column) {
    while (true) {
      try {
        return workspace.References(shop, workspace.OffsetOf(shop, static_cast<int>(line), static_cast<int>(column)));
      } catch (const SourceChanged&) {
        workspace.Refresh();
      }
    }
  };
  const size_t before = references(2, 9).size();
  folder.Write("user3.py", "# nothing is left\n");
  folder.Write("user4.py", "x = 1\n" + std::string(1000, '\n') + "from shop import Shop\nShop().total()\n");
  workspace.Refresh();
  const size_t behind = references(2, 9).size();
  EXPECT_LT(behind, before);
  for (int i = 0; i < 20; ++i) {
    folder.Write("shop.py", std::string(static_cast<size_t>(i + 1), '\n') + "class Shop:\n    def total(self): pass\n");
    folder.Write("user5.py", std::string(static_cast<size_t>(i % 3), '\n') + "from shop import Shop\nShop().total\n");
    for (const Location& location : references(static_cast<uint32_t>(i + 3), 9)) {
      const std::string line = workspace.LineOf(location.file, location.begin);
      EXPECT_NE(line.find("total"), std::string::npos) << line;
    }
    workspace.Refresh();
  }
}

}  // namespace
}  // namespace quillet
