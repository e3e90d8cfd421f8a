// Ignore rules: what a pattern matches, which rule decides, how lines are cut, and that stars cost no more than text.
#include "project/ignore_rules.h"

#include <gtest/gtest.h>

#include <string>

namespace quillet {
namespace {

using Verdict = IgnoreRules::Verdict;

bool Excludes(Text rules, Text path, bool is_folder = false) {
  return IgnoreRules(rules).Of(path, is_folder) == Verdict::kExcluded;
}

struct Case {
  Text rules;
  Text path;
  bool excluded;
};

void Check(std::initializer_list<Case> cases) {
  for (const Case& c : cases) EXPECT_EQ(Excludes(c.rules, c.path), c.excluded) << c.rules << " : " << c.path;
}

TEST(IgnoreRules, MatchTheLastPartWithoutASlashAndTheWholePathWithOne) {
  Check({
      {"a.py", "a.py", true},
      {"a.py", "x/a.py", true},
      {"/a.py", "x/a.py", false},
      {"/a.py", "a.py", true},
      {"x/a.py", "x/a.py", true},
      {"x/a.py", "y/x/a.py", false},
      {"*.py", "x/y/a.py", true},
      {"x/*.py", "x/y/a.py", false},
      {"x?y", "x/y", false},
      {"x[/]y", "x/y", false},
      {"a", "aa", false},
      {"", "a", false},
      {"/", "a", false},
  });
}

TEST(IgnoreRules, TakeFoldersAloneBehindASlashAtTheEnd) {
  EXPECT_TRUE(Excludes("build/", "x/build", true));
  EXPECT_FALSE(Excludes("build/", "x/build", false));
}

TEST(IgnoreRules, TakeAnyNumberOfPartsForTwoStarsBetweenSlashes) {
  Check({
      {"**/a.py", "a.py", true},
      {"**/a.py", "x/y/a.py", true},
      {"**/a.py", "x/ya.py", false},
      {"x/**/a.py", "x/a.py", true},
      {"x/**/a.py", "x/y/z/a.py", true},
      {"x/**/a.py", "xa.py", false},
      {"x/**", "x/y/z", true},
      {"x/**", "x", false},
      {"x/y**z", "x/yaz", true},
      {"x/y*z**w", "x/yz/w", false},
      {"**/x/**/y", "a/x/b/c/y", true},
      {"**/**/y", "y", true},
      {"**\\/y", "y", false},
      {"**\\/y", "x/y", true},
  });
}

TEST(IgnoreRules, KnowSets) {
  Check({
      {"[a-c].py", "b.py", true},
      {"[a-c].py", "d.py", false},
      {"[!a-c].py", "d.py", true},
      {"[^a-c].py", "b.py", false},
      {"[]a].py", "].py", true},
      {"[a-].py", "-.py", true},
      {"[z-a].py", "m.py", false},
      {"[[:alpha:]].py", "m.py", true},
      {"[[:alpha:]].py", "1.py", false},
      {"[[:cntrl:]].py", "\x1F.py", true},
      {"[[:cntrl:]].py", "\x7F.py", true},
      {"[[:cntrl:]].py", " .py", false},
      {"[[:digit:]x].py", "x.py", true},
      {"[[:none:]].py", "x.py", false},
      {"[[:digit].py", ":.py", true},
      {"[\\]].py", "].py", true},
      {"[a.py", "[a.py", false},
      {"a\\", "a\\", false},
      {"\\*.py", "*.py", true},
      {"\\*.py", "a.py", false},
  });
}

TEST(IgnoreRules, AreLinesThatEndAtLineFeedsAlone) {
  Check({
      {"a\r\nb", "a", true},
      {"a\r", "a", true},
      {"a\vb", "a\vb", true},
      {"a\vb", "b", false},
      {"a\xE2\x80\xA8"
       "b",
       "b", false},
      {"\xEF\xBB\xBF"
       "a",
       "a", true},
      {"# a", "# a", false},
      {"\\#a", "#a", true},
      {"a  ", "a", true},
      {"a\\ ", "a ", true},
      {"a\\  ", "a ", true},
      {"a b", "a b", true},
      {"a\t", "a", false},
      {Text("a\0b", 3), "a", true},
  });
}

TEST(IgnoreRules, LetTheLastMatchDecide) {
  IgnoreRules rules("*.py\n!a.py\n\\!b.py\n");
  EXPECT_EQ(rules.Of("a.py", false), Verdict::kIncluded);
  EXPECT_EQ(rules.Of("b.py", false), Verdict::kExcluded);
  EXPECT_EQ(rules.Of("!b.py", false), Verdict::kExcluded);
  EXPECT_EQ(rules.Of("c.txt", false), Verdict::kNone);
  EXPECT_TRUE(IgnoreRules("#a\n\n!\n").empty());
}

// Tried one against another, the stars of these take longer than a test may.
TEST(IgnoreRules, TryNoStarAgainstAnother) {
  std::string stars;
  for (int i = 0; i < 200; ++i) stars += "*a";
  const std::string path(4000, 'a');
  EXPECT_TRUE(Excludes(stars, path));
  EXPECT_FALSE(Excludes(stars + "[b]", path));
  std::string folders = "x/";
  std::string deep = "x/";
  for (int i = 0; i < 100; ++i) {
    folders += "**/a*/";
    deep += "a/a/";
  }
  EXPECT_TRUE(Excludes(folders + "a", deep + "a"));
  EXPECT_FALSE(Excludes(folders + "[b]", deep + "a"));
}

}  // namespace
}  // namespace quillet
