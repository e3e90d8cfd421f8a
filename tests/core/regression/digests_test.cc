// What the core says of every source that comes with the tests is what it said when tests/digests.txt was
// written: a change that nobody meant shows here first, by the file and the stage.
#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "tests/core/support/shipped_digests.h"

namespace quillet::testing {
namespace {

std::vector<std::string> WordsOf(const std::string& line) {
  std::istringstream in(line);
  std::vector<std::string> words;
  for (std::string word; in >> word;) words.push_back(word);
  return words;
}

// The lines of the table by the file that they are about, which is their last word.
std::map<std::string, std::vector<std::string>> Table() {
  std::ifstream in(kDigestTable, std::ios::binary);
  std::map<std::string, std::vector<std::string>> table;
  for (std::string line; std::getline(in, line);) {
    std::vector<std::string> words = WordsOf(line);
    const std::string file = words.back();
    table[file] = std::move(words);
  }
  return table;
}

constexpr const char* kWhatNow = "; where that is meant, ./run golden writes the table again";

TEST(Digests, AreThoseOfTheTable) {
  auto table = Table();
  const std::vector<std::string> stages = WordsOf(DigestHead());
  ASSERT_EQ(table["file"], stages) << "the table has other stages" << kWhatNow;
  table.erase("file");
  const std::vector<ShippedSource> sources = ShippedSources();
  for (const ShippedSource& source : sources) {
    const auto expected = table.find(source.path);
    if (expected == table.end()) {
      ADD_FAILURE() << source.path << " is not in the table" << kWhatNow;
      continue;
    }
    const std::vector<std::string> found = WordsOf(DigestLine(source, sources));
    ASSERT_EQ(found.size(), expected->second.size());
    for (size_t i = 0; i + 1 < found.size(); ++i) {
      EXPECT_EQ(found[i], expected->second[i])
          << stages[i] << " of " << source.path << " is said otherwise: compare what `quillet_digest --show "
          << stages[i] << " " << source.path << "` says here and in a build without the change" << kWhatNow;
    }
    table.erase(expected);
    if (GTEST_FLAG_GET(fail_fast) && HasFailure()) return;
  }
  for (const auto& [file, words] : table) ADD_FAILURE() << file << " is in the table and not there" << kWhatNow;
}

}  // namespace
}  // namespace quillet::testing
