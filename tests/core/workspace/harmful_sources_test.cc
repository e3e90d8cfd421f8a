// Questions about sources made to do harm: they end, on a small stack, and take as many steps more as the source is
// larger.
#include <gtest/gtest.h>
#include <pthread.h>

#include <cstdint>
#include <string>

#include "foundations/stop.h"
#include "tests/core/support/small_library.h"
#include "workspace/questions.h"

namespace quillet {
namespace {

struct Shape {
  const char* name;
  std::string front;
  std::string unit;  // a `#` in it stands for its number
  std::string end;
};

std::string Make(const Shape& shape, int count) {
  std::string text = shape.front;
  for (int i = 0; i < count; ++i)
    for (const char c : shape.unit) c == '#' ? text.append(std::to_string(i)) : text.append(1, c);
  return text + shape.end;
}

// Asks all there is to ask, at its beginning, in its middle and at its end.
void Ask(const std::string& text) {
  Workspace::Settings settings;
  settings.roots = {"/nowhere"};
  settings.typeshed = testing::SmallLibrary();
  settings.version = Version::Of(3, 12);
  Workspace workspace(std::move(settings));
  const FileId file = workspace.FileOf("/nowhere/a.py");
  workspace.Open(file, text);
  const auto size = static_cast<uint32_t>(text.size());
  for (const uint32_t at : {uint32_t{1}, size / 2, size - 2}) {
    workspace.Definitions(file, at);
    workspace.TypeDefinitions(file, at);
    workspace.Declarations(file, at);
    workspace.Implementations(file, at);
    workspace.References(file, at);
    workspace.Types(file, at);
    workspace.HoverAt(file, at);
    workspace.Signatures(file, at);
    workspace.Complete(file, at);
    workspace.Callers(file, at);
    workspace.Callees(file, at);
    workspace.Supertypes(file, at);
    workspace.Selections(file, at);
    workspace.RenameTo(file, at, "other");
  }
  workspace.Outline(file);
  workspace.Problems(file);
  workspace.Folds(file);
  workspace.Colours(file);
  workspace.Hints(file);
  workspace.Symbols("a");
}

struct Run {
  const std::string* text;
  int64_t steps;
};

void* AskAndCount(void* argument) {
  Run& run = *static_cast<Run*>(argument);
  constexpr int64_t kEnough = int64_t{1} << 60;
  stop::steps_left = kEnough;
  Ask(*run.text);
  run.steps = kEnough - stop::steps_left;
  return nullptr;
}

// A sanitizer's frames are several times as large.
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
constexpr size_t kStack = size_t{8} << 20;
#else
constexpr size_t kStack = size_t{512} << 10;
#endif

// The steps that it takes on a stack of half a mebibyte.
int64_t StepsOf(const std::string& text) {
  Run run{&text, 0};
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setstacksize(&attributes, kStack);
  pthread_t thread;
  if (pthread_create(&thread, &attributes, AskAndCount, &run) != 0) return -1;
  pthread_join(thread, nullptr);
  return run.steps;
}

const Shape kShapes[] = {
    {"conditionals", "x = a", " if b else c", "\nx\n"},
    {"conditionals of names", "x = a", " if b# else c#", "\nx\n"},
    {"conditionals about one name", "x = a", " if a else a", "\nx\n"},
    {"and", "x = a", " and a", "\nx\n"},
    {"or in a condition", "if a", " or a == #", ": a\na\n"},
    {"elif", "if a: x = 0\n", "elif a == #: x = #\n", "x\n"},
    {"elif with returns", "def f(a):\n if a: return 0\n", " elif a == #: return #\n", "f(1)\n"},
    {"if", "", "if a: x = #\n", "x\n"},
    {"not in a condition", "if ", "not ", "a: x = 1\nx\n"},
    {"blocks in blocks", "x = 0\n", "if a: ", "x = 1\nx\n"},
    {"loops in loops", "x = 0\n", "for a in b: ", "x = 1\nx\n"},
    {"attributes", "x = a", ".b", "\nx\n"},
    {"calls", "def f(): pass\nx = f", "()", "\nx\n"},
    {"attributes and calls", "def f(): pass\nx = f", ".b()", "\nx\n"},
    {"parameters", "def f(", "a#, ", "): return a1\nf(1)\n"},
    {"tuple parameters", "def f(", "(a#, b), ", "): return a1\nf(1)\n"},
    {"decorators", "", "@a#\n", "def f(): pass\nf()\n"},
    {"comprehension clauses", "x = [a", " for a in b", "]\nx\n"},
    {"calls of many", "", "def f#(): f#()\n", "f0()\n"},
    {"calls of a name that nothing binds", "", "f(\n", "f\n"},
    {"targets on a line", "", "a#, ", "b = c\n"},
    {"imports of one name", "", "import a# as b\n", "b\n"},
    {"a long path", "import a", ".b", "\na\n"},
    {"definitions in definitions", "x = 0\n", "def f(): ", "x = 1\nx\n"},
};

TEST(HarmfulSources, AreAnsweredInStepsThatGrowAsTheyDo) {
  constexpr int kCount = 3000, kTimes = 4;
  for (const Shape& shape : kShapes) {
    const int64_t few = StepsOf(Make(shape, kCount)), many = StepsOf(Make(shape, kTimes * kCount));
    EXPECT_GT(few, 0) << shape.name;
    EXPECT_LT(many, 2 * kTimes * few) << shape.name << ": " << few << " steps";
  }
}

TEST(HarmfulSources, AreAnsweredAtALargeCount) {
  constexpr int kCount = 10'000;
  for (const Shape& shape : kShapes) EXPECT_GT(StepsOf(Make(shape, kCount)), 0) << shape.name;
}

}  // namespace
}  // namespace quillet
