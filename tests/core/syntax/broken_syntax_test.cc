// Broken code by the thousand, and code that is too deep: sources with a token taken out, doubled or put
// elsewhere, sources that end anywhere, and long rows of whatever nests. What holds for all trees is checked for
// each by readers that have read everything before.
#include <gtest/gtest.h>
#include <pthread.h>

#include <algorithm>
#include <deque>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "tests/core/support/verify_syntax.h"

namespace quillet {
namespace {

constexpr Version kVersions[] = {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 14)};

std::vector<std::string> Sources() {
  std::vector<std::string> paths;
  for (const char* folder : {"/fuzz/corpus/syntax", "/fuzz/corpus/names", "/fuzz/corpus/lines"}) {
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

  static std::vector<Text> TokensOf(const std::string& bytes, Ref<SourceText>& source) {
    source = SourceText::Copy(bytes);
    TokenizeOnly(*source, Version::Of(3, 12));
    std::vector<Text> tokens;
    for (const Token& token : source->tokens) tokens.push_back(token.view());
    return tokens;
  }

  std::deque<SyntaxReader> readers_;
  std::vector<LineRow> rows_;
  size_t count_ = 0;
};

TEST_F(BrokenSyntax, SourcesAsTheyAre) {
  for (const std::string& bytes : Sources()) ASSERT_TRUE(Check(bytes));
  EXPECT_GT(count_, 24u);
}

TEST_F(BrokenSyntax, ATokenIsTakenOutOrDoubled) {
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

TEST_F(BrokenSyntax, ATokenOfElsewhereIsPutIn) {
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

TEST_F(BrokenSyntax, TheSourceEndsEarly) {
  for (const std::string& bytes : Sources()) {
    for (size_t size = 0; size < bytes.size(); size += 3) ASSERT_TRUE(Check(bytes.substr(0, size)));
  }
}

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
