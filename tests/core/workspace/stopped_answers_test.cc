// Answers behind one that was ended before its end.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "foundations/stop.h"
#include "tests/core/support/temporary_folder.h"
#include "workspace/questions.h"

namespace quillet {
namespace {

using testing::TemporaryFolder;

constexpr int kModules = 12;

// Modules of which each takes its values from the one before, so that a type is found by reading all of them.
void WriteChain(const TemporaryFolder& folder) {
  folder.Write("m0.py", "class Thing: pass\n\ndef make():\n    return Thing()\n");
  std::string more;  // so that reading takes steps
  for (int i = 0; i < 400; ++i) more += "y = 0\n";
  for (int i = 1; i < kModules; ++i) {
    const std::string before = "m" + std::to_string(i - 1);
    folder.Write(
        "m" + std::to_string(i) + ".py",
        "from " + before + " import make as inner\n\ndef make():\n    found = inner()\n    return found\n" + more);
  }
  folder.Write("last.py", "from m" + std::to_string(kModules - 1) + " import make\nvalue = make()\nvalue\n");
}

Workspace::Settings SettingsOf(const TemporaryFolder& folder) {
  Workspace::Settings settings;
  settings.roots = {folder.path()};
  settings.version = Version::Of(3, 12);
  return settings;
}

std::vector<std::string> Ask(Workspace& workspace, const TemporaryFolder& folder) {
  const FileId file = workspace.FileOf(folder / "last.py");
  std::vector<std::string> answer = workspace.Types(file, workspace.OffsetOf(file, 3, 1));
  for (const Location& location : workspace.References(file, workspace.OffsetOf(file, 1, 17)))
    answer.push_back(workspace.PathOf(location.file) + ":" + std::to_string(location.begin));
  return answer;
}

TEST(Answers, AreWholeBehindOneThatWasStopped) {
  const TemporaryFolder folder;
  WriteChain(folder);
  Workspace fresh(SettingsOf(folder));
  const std::vector<std::string> wanted = Ask(fresh, folder);
  ASSERT_GE(wanted.size(), 3u);
  ASSERT_EQ(wanted[0], "m0.Thing") << "the type, and then places";
  int stopped = 0;
  for (int64_t steps = 1; steps < kStepsBetweenQuestions; steps += steps / 8 + 50) {
    Workspace workspace(SettingsOf(folder));
    {
      const ThreadStopQuestion never([] { throw Stopped(); });
      stop::steps_left = steps;
      try {
        Ask(workspace, folder);
      } catch (const Stopped&) {
        ++stopped;
        workspace.Recover();
      }
      stop::steps_left = kStepsBetweenQuestions;
    }
    EXPECT_EQ(Ask(workspace, folder), wanted) << steps;
  }
  EXPECT_GT(stopped, 10);
}

}  // namespace
}  // namespace quillet
