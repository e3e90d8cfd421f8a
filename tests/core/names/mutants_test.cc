// Broken code by the thousand: sources with a token taken out, doubled or put elsewhere, and sources that
// end anywhere. What holds for all bindings is checked for each, in all versions, by one binder that is
// used for all of them.
#include <gtest/gtest.h>

#include <deque>
#include <string>
#include <vector>

#include "tests/core/support/spoilt_sources.h"
#include "tests/core/support/verify_names.h"

namespace quillet {
namespace {

constexpr Version kVersions[] = {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 8), Version::Of(3, 12),
                                 Version::Of(3, 14)};

std::vector<std::string> Sources() { return CorpusSources({"names", "lines"}); }

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

  auto Checking() {
    return [this](const std::string& bytes) { return Check(bytes); };
  }

  std::deque<NameBinder> binders_;
  std::vector<LineRow> rows_;
  size_t count_ = 0;
};

TEST_F(Mutants, SourcesAsTheyAre) {
  for (const std::string& bytes : Sources()) ASSERT_TRUE(Check(bytes));
  EXPECT_GT(count_, 40u);
}

TEST_F(Mutants, ATokenIsTakenOutOrDoubled) { EXPECT_TRUE(TokensTakenOutOrDoubled(Sources(), Checking())); }

TEST_F(Mutants, ATokenOfElsewhereIsPutIn) { EXPECT_TRUE(TokensOfElsewherePutIn(Sources(), Checking())); }

TEST_F(Mutants, TheSourceEndsEarly) { EXPECT_TRUE(SourcesEndEarly(Sources(), Checking())); }

}  // namespace
}  // namespace quillet
