// Broken code by the thousand: sources with a token taken out, doubled or put elsewhere, and sources that
// end anywhere. What holds for all bindings is checked for each, in all versions, by one binder that is
// used for all of them.
#include <gtest/gtest.h>

#include <algorithm>
#include <deque>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "tests/core/support/verify_names.h"

namespace quillet {
namespace {

constexpr Version kVersions[] = {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 8), Version::Of(3, 12),
                                 Version::Of(3, 14)};

std::vector<std::string> Sources() {
  std::vector<std::string> paths;
  for (const char* folder : {"/fuzz/corpus/names", "/fuzz/corpus/lines"}) {
    for (const auto& entry : std::filesystem::directory_iterator(std::string(QUILLET_SOURCE_DIR) + folder))
      paths.push_back(entry.path().string());
  }
  std::sort(paths.begin(), paths.end());
  std::vector<std::string> sources;
  for (const std::string& path : paths) {
    std::ifstream file(path, std::ios::binary);
    std::stringstream bytes;
    bytes << file.rdbuf();
    sources.push_back(bytes.str());
  }
  return sources;
}

class Mutants : public ::testing::Test {
 protected:
  Mutants() {
    for (const Version version : kVersions) binders_.emplace_back(version);
  }

  // False where something is wrong.
  bool Check(const std::string& bytes) {
    const Ref<SourceText> source = SourceText::Copy(bytes);
    for (size_t i = 0; i < binders_.size(); ++i) {
      rows_.clear();
      CutLines(*source, kVersions[i], rows_);
      const std::string wrong = VerifyNames(*source, rows_, kVersions[i], binders_[i]);
      EXPECT_EQ(wrong, "") << "in " << kVersions[i].parts[0] << "." << kVersions[i].parts[1] << ":\n" << bytes;
      if (!wrong.empty()) return false;
      ++count_;
    }
    return true;
  }

  // The bytes of each token, of the source as 3.12 reads it.
  static std::vector<Text> TokensOf(const std::string& bytes, Ref<SourceText>& source) {
    source = SourceText::Copy(bytes);
    TokenizeOnly(*source, Version::Of(3, 12));
    std::vector<Text> tokens;
    for (const Token& token : source->tokens) tokens.push_back(token.view());
    return tokens;
  }

  std::deque<NameBinder> binders_;
  std::vector<LineRow> rows_;
  size_t count_ = 0;
};

TEST_F(Mutants, SourcesAsTheyAre) {
  for (const std::string& bytes : Sources()) ASSERT_TRUE(Check(bytes));
  EXPECT_GT(count_, 40u);
}

TEST_F(Mutants, ATokenIsTakenOutOrDoubled) {
  for (const std::string& bytes : Sources()) {
    Ref<SourceText> source;
    for (const Text token : TokensOf(bytes, source)) {
      const auto begin = static_cast<size_t>(token.data() - source->begin());
      std::string changed = bytes;
      ASSERT_TRUE(Check(changed.erase(begin, token.size())));
      changed = bytes;
      ASSERT_TRUE(Check(changed.insert(begin, std::string(token) + " ")));
    }
  }
}

TEST_F(Mutants, ATokenOfElsewhereIsPutIn) {
  uint32_t state = 1;
  const auto random = [&state](size_t below) {
    state = state * 1664525u + 1013904223u;
    return (state >> 8) % below;
  };
  const std::vector<std::string> sources = Sources();
  for (const std::string& bytes : sources) {
    Ref<SourceText> source;
    Ref<SourceText> other;
    const std::vector<Text> tokens = TokensOf(bytes, source);
    const std::vector<Text> others = TokensOf(sources[random(sources.size())], other);
    if (tokens.empty() || others.empty()) continue;
    for (int i = 0; i < 200; ++i) {
      std::string changed = bytes;
      for (int j = 0; j < 1 + i % 3; ++j) {
        const auto at = static_cast<size_t>(tokens[random(tokens.size())].data() - source->begin());
        changed.insert(at, " " + std::string(others[random(others.size())]) + " ");
      }
      ASSERT_TRUE(Check(changed));
    }
  }
}

TEST_F(Mutants, TheSourceEndsEarly) {
  for (const std::string& bytes : Sources()) {
    for (size_t size = 0; size < bytes.size(); size += 3) ASSERT_TRUE(Check(bytes.substr(0, size)));
  }
}

}  // namespace
}  // namespace quillet
