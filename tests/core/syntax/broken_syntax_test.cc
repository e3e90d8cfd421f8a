// Broken code by the thousand, and code that is too deep: sources with a token taken out, doubled or put
// elsewhere, sources that end anywhere, and long rows of whatever nests. What holds for all trees is checked for
// each by readers that have read everything before.
#include <gtest/gtest.h>
#include <pthread.h>

#include <deque>
#include <string>
#include <vector>

#include "tests/core/support/spoilt_sources.h"
#include "tests/core/support/verify_syntax.h"

namespace quillet {
namespace {

constexpr Version kVersions[] = {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 14)};

std::vector<std::string> Sources() { return CorpusSources({"syntax", "names", "lines"}); }

// What may hold itself, opened and closed again, or stand in a row without end.
constexpr struct {
  const char* head;
  const char* open;
  const char* close;
} kNesting[] = {
    {"", "(", ")"},
    {"", "[", "]"},
    {"", "{", "}"},
    {"", "{1: ", "}"},
    {"", "f(", ")"},
    {"", "f(a=", ")"},
    {"", "x[", "]"},
    {"", "x[a:", "]"},
    {"", "`", "`"},
    {"", "lambda: ", ""},
    {"", "lambda x=", ": 1"},
    {"", "(yield ", ")"},
    {"", "yield ", ""},
    {"", "a := ", ""},
    {"", "(a := ", ")"},
    {"", "a if b else ", ""},
    {"", "a if ", " else b"},
    {"", "not ", ""},
    {"", "-", ""},
    {"", "await ", ""},
    {"", "2 ** ", ""},
    {"", "2 ** -", ""},
    {"", "a < ", ""},
    {"", "a and b or ", ""},
    {"", "*", ""},
    {"", "a.", ""},
    {"", "a = ", ""},
    {"", "[x for x in ", "]"},
    {"", "[x for x in y if ", "]"},
    {"", "f'{", "}'"},
    {"", "f'{x:{", "}}'"},
    {"", "t'{", "}'"},
    {"x: ", "List['", "']"},
    {"x: ", "List[", "]"},
    {"x = 1 # type: ", "(", ")"},
    {"x = 1 # type: ", "(int) -> ", ""},
    {"", "if a: ", ""},
    {"", "else: ", ""},
    {"", "def f(): ", ""},
    {"", "def f(a: ", ")"},
    {"", "class C(", ")"},
    {"", "class C[T: ", "]"},
    {"", "@", ""},
    {"", "@a\n", ""},
    {"", "with (", ")"},
    {"", "with (a, ", ")"},
    {"", "import a.", ""},
    {"", "from . import (", ")"},
    {"match x:\n case ", "(", ")"},
    {"match x:\n case ", "[*", "]"},
    {"match x:\n case ", "{1: ", "}"},
    {"match x:\n case ", "C(a=", ")"},
    {"match x:\n case ", "a | ", ""},
    {"match x:\n case ", "-", ""},
    {"", "del (", ")"},
    {"", "for (", ")"},
    {"", "x(\n with (", ")"},
    {"", "x(\n def f(", ")"},
    {"", "x(\ny(", ")"},
    {"", "match (", ":"},
    {"", ")", ""},
    {"", ";", ""},
    {"", "$", ""},
};

class BrokenSyntax : public ::testing::Test {
 public:
  void ReadNested() {
    for (const auto& nesting : kNesting) {
      for (const size_t depth : {210, 5'000}) {
        std::string open = nesting.head, closed;
        for (size_t i = 0; i < depth; ++i) open += nesting.open;
        for (size_t i = 0; i < depth; ++i) closed += nesting.close;
        Check(open);
        Check(open + "a" + closed + "\n");
        Check(open + "\nx = 1\n");
      }
    }
  }

 protected:
  BrokenSyntax() {
    for (const Version version : kVersions) readers_.emplace_back(version);
  }

  // False where something is wrong.
  bool Check(const std::string& bytes) {
    const Ref<SourceText> source = SourceText::Copy(bytes);
    for (size_t i = 0; i < readers_.size(); ++i) {
      rows_.clear();
      CutLines(*source, kVersions[i], rows_);
      const std::string wrong = VerifySyntax(*source, rows_, kVersions[i], readers_[i]);
      EXPECT_EQ(wrong, "") << "in " << kVersions[i].parts[0] << "." << kVersions[i].parts[1] << ":\n"
                           << bytes.substr(0, 4000);
      if (!wrong.empty()) return false;
      ++count_;
    }
    return true;
  }

  auto Checking() {
    return [this](const std::string& bytes) { return Check(bytes); };
  }

  std::deque<SyntaxReader> readers_;
  std::vector<LineRow> rows_;
  size_t count_ = 0;
};

TEST_F(BrokenSyntax, SourcesAsTheyAre) {
  for (const std::string& bytes : Sources()) ASSERT_TRUE(Check(bytes));
  EXPECT_GT(count_, 24u);
}

TEST_F(BrokenSyntax, ATokenIsTakenOutOrDoubled) { EXPECT_TRUE(TokensTakenOutOrDoubled(Sources(), Checking())); }

TEST_F(BrokenSyntax, ATokenOfElsewhereIsPutIn) { EXPECT_TRUE(TokensOfElsewherePutIn(Sources(), Checking())); }

TEST_F(BrokenSyntax, TheSourceEndsEarly) { EXPECT_TRUE(SourcesEndEarly(Sources(), Checking())); }

TEST_F(BrokenSyntax, DepthHasALimit) {
  // Far less than a thread has by itself, as some hosts give.
  struct Run {
    BrokenSyntax* test;
    static void* Start(void* at) {
      static_cast<Run*>(at)->test->ReadNested();
      return nullptr;
    }
  } run{this};
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
  pthread_attr_setstacksize(&attributes, size_t{4} << 20);  // frames are several times as large
#else
  pthread_attr_setstacksize(&attributes, size_t{512} << 10);
#endif
  pthread_t thread;
  ASSERT_EQ(pthread_create(&thread, &attributes, &Run::Start, &run), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
  EXPECT_EQ(count_, std::size(kNesting) * 2 * 3 * std::size(kVersions));
}

}  // namespace
}  // namespace quillet
