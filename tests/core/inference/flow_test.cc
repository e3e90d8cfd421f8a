// Which bindings of a name reach a place, and whether it is surely bound there.
#include <gtest/gtest.h>

#include <string>

#include "inference/inference.h"
#include "tests/core/support/small_library.h"
#include "tests/core/support/temporary_folder.h"

namespace quillet {
namespace {

// The lines of the bindings that reach the name behind `$`, with "?" where it may be unbound.
std::string Reaching(std::string text, Version version = Version::Of(3, 12)) {
  const testing::TemporaryFolder folder;
  const size_t mark = text.find('$');
  text.erase(mark, 1);
  Files files(version);
  Modules::Settings settings;
  settings.roots = {folder.path()};
  settings.typeshed = testing::SmallLibrary();
  Modules modules(files, settings);
  Inference inference(files, modules);
  const FileId id = files.NumberOf(folder / "a.py");
  files.Open(id, text);
  const SourceFile* file = files.Get(id);
  const uint32_t index = file->OccurrenceBeginningAt(static_cast<uint32_t>(mark));
  if (index == kNoIndex) return "no name";
  bool may_be_unbound = false;
  std::string lines;
  for (const Binding& binding : inference.BindingsReaching(*file, index, &may_be_unbound))
    lines += (lines.empty() ? "" : " ") + std::to_string(file->PlaceOf(binding.offset).line);
  return lines + (may_be_unbound ? "?" : "");
}

struct Case {
  const char* text;
  const char* lines;
};

void Check(std::initializer_list<Case> cases) {
  for (const Case& one : cases) EXPECT_EQ(Reaching(one.text), one.lines) << one.text;
}

TEST(Flow, TakesTheLastOfWhatFollowsEachOther) {
  Check({
      {"x = 1\nx = 2\n$x\n", "2"},
      {"x = 1\n$x\nx = 2\n", "1"},
      {"x = 1\nx = $x\n", "1"},
      {"x = 1\nx += $x\n", "1"},
      {"x = 1\nx += 2\n$x\n", "2"},
      {"import x\n$x\n", "1"},
      {"def x(): pass\nx = 1\nclass x: pass\n$x\n", "3"},
      {"x, y = 1, 2\n[x, *y] = 3\n$x\n", "2"},
      {"x = y = 1\n$y\n", "1"},
      {"x = 1\ny = (x := 2)\n$x\n", "2"},
      {"x = 1; x = 2; $x\n", "1"},
  });
}

TEST(Flow, SetsBranchesBesideEachOther) {
  Check({
      {"x = 1\nif a:\n  x = 2\n$x\n", "1 3"},
      {"x = 1\nif a:\n  x = 2\nelse:\n  x = 3\n$x\n", "3 5"},
      {"x = 1\nif a:\n  x = 2\nelif b:\n  x = 3\n$x\n", "1 3 5"},
      {"x = 1\nif a:\n  x = 2\nelif b:\n  x = 3\nelse:\n  x = 4\n$x\n", "3 5 7"},
      {"x = 1\nif a:\n  x = 2\n  $x\n", "3"},
      {"x = 1\nif a:\n  x = 2\nelse:\n  $x\n", "1"},
      {"x = 1\nif a:\n  x = 2\nelif $x:\n  pass\n", "1"},
      {"if a:\n  x = 2\n$x\n", "2?"},
      {"if a:\n  x = 2\nelse:\n  x = 3\n$x\n", "2 4"},
      {"if a:\n  if b:\n    x = 1\n  else:\n    x = 2\nelse:\n  x = 3\n$x\n", "3 5 7"},
      {"x = 1\nif (x := 2):\n  $x\n", "2"},
      {"x = 1\nif (x := 2):\n  pass\n$x\n", "2"},
  });
}

TEST(Flow, KnowsWhichAssignmentExpressionsAreEvaluated) {
  Check({
      {"x = 1\na and (x := 2)\n$x\n", "1 2"},
      {"x = 1\n(x := 2) and a\n$x\n", "2"},
      {"x = 1\n(x := 2) and $x\n", "2"},
      {"x = 1\na or (x := 2) or $x\n", "2"},
      {"x = 1\nf(a or (x := 2), $x)\n", "1 2"},
      {"x = 1\ny = (x := 2) if a else 3\n$x\n", "1 2"},
      {"x = 1\ny = 3 if (x := 2) else 4\n$x\n", "2"},
      {"x = 1\na < (x := 2) < b\n$x\n", "2"},
      {"x = 1\na < b < (x := 2)\n$x\n", "1 2"},
      {"x = 1\ny = [x := i for i in a]\n$x\n", "1 2"},
      {"x = 1\nif a and (x := 2):\n  $x\n", "2"},
      {"x = 1\nif a or (x := 2):\n  $x\n", "1 2"},
      {"x = 1\nif a and (x := 2):\n  pass\nelse:\n  $x\n", "1 2"},
      {"x = 1\nif (x := 2):\n  x = 3\nelse:\n  x = 4\n$x\n", "3 5"},
      {"x = 1\nif a:\n  pass\nelif (x := 2):\n  pass\n$x\n", "1 4"},
      {"x = 1\nif (x := 2):\n  pass\nelif a:\n  $x\n", "2"},
      {"x = 1\nif (x := 2):\n  pass\nelif $x:\n  pass\n", "2"},
      {"while (x := a):\n  pass\n$x\n", "1"},
  });
}

TEST(Flow, FollowsNoBranchThatIsNotRun) {
  Check({
      {"x = 1\nif True:\n  x = 2\n$x\n", "3"},
      {"x = 1\nif False:\n  x = 2\n$x\n", "1"},
      {"import sys\nif sys.version_info >= (3,):\n  x = 2\nelse:\n  x = 3\n$x\n", "3"},
      {"import sys\nif sys.version_info < (3, 0):\n  x = 2\nelse:\n  x = 3\n$x\n", "5"},
      {"from typing import TYPE_CHECKING\nx = 1\nif TYPE_CHECKING:\n  x = 2\n$x\n", "4"},
  });
}

TEST(Flow, IsNotLeftByBranchesThatReturnOrRaise) {
  Check({
      {"def f(a):\n  x = 1\n  if a:\n    x = 2\n    return\n  $x\n", "2"},
      {"def f(a):\n  x = 1\n  if a:\n    x = 2\n    raise a\n  $x\n", "2"},
      {"def f(a):\n  if a:\n    return\n  else:\n    x = 1\n  $x\n", "5"},
      {"def f(a):\n  if a:\n    x = 1\n  else:\n    raise a\n  $x\n", "3"},
      {"def f(a):\n  x = 1\n  if a:\n    x = 2\n    if a:\n      return\n    else:\n      raise a\n  $x\n", "2"},
      {"def f(a):\n  x = 1\n  if a:\n    with a:\n      x = 2\n      return\n  $x\n", "2"},
  });
}

TEST(Flow, GoesRoundLoops) {
  Check({
      {"x = 1\nfor i in a:\n  $x\n  x = 2\n", "1 4"},
      {"x = 1\nfor i in a:\n  x = 2\n$x\n", "1 3"},
      {"for x in a:\n  $x\n", "1"},
      {"x = 1\nfor x in a:\n  pass\n$x\n", "1 2"},
      {"for x in a:\n  pass\n$x\n", "1?"},
      {"x = 1\nfor x in $x:\n  pass\n", "1"},
      {"x = 1\nwhile a:\n  $x\n  x = 2\n", "1 4"},
      {"x = 1\nwhile $x:\n  x = 2\n", "1 3"},
      {"x = 1\nwhile a:\n  if $x:\n    x = 2\n    continue\n  x = 3\n", "1 4 6"},
      {"x = 1\nwhile a:\n  x = 2\nelse:\n  x = 3\n$x\n", "5"},
      {"x = 1\nfor i in a:\n  for j in i:\n    $x\n  x = 2\n", "1 5"},
  });
}

TEST(Flow, JumpsOutOfLoopsAndBackToTheirBeginning) {
  Check({
      {"x = 1\nfor i in a:\n  if i:\n    x = 2\n    break\n  x = 3\n$x\n", "1 4 6"},
      {"x = 1\nfor i in a:\n  if i:\n    x = 2\n    break\n  $x\n", "1"},
      {"x = 1\nfor i in a:\n  if i:\n    x = 2\n    continue\n  x = 3\n$x\n", "1 4 6"},
      {"x = 1\nfor i in a:\n  $x\n  x = 2\n  x = 3\n", "1 5"},
      {"x = 1\nfor i in a:\n  x = 2\n  break\nelse:\n  x = 3\n$x\n", "3 6"},
      {"x = 1\nfor i in a:\n  x = 2\n  break\nelse:\n  $x\n", "1"},
      {"for i in a:\n  if i:\n    x = 1\n    break\nelse:\n  x = 2\n$x\n", "3 6"},
      {"for i in a:\n  if i:\n    x = 1\n    break\nelse:\n  raise a\n$x\n", "3"},
      {"for i in a:\n  pass\nelse:\n  x = 1\n$x\n", "4"},
      {"x = 1\nfor i in a:\n  for j in a:\n    x = 2\n    break\n  $x\n", "1 4"},
      {"for x in a:\n  break\nelse:\n  x = 2\n$x\n", "1 4"},
  });
}

TEST(Flow, LeavesEndlessLoopsByTheirBodyOnly) {
  Check({
      {"x = 1\nwhile True:\n  $x\n  x = 2\n", "1 4"},
      {"while True:\n  try:\n    x = 1\n    break\n  except E:\n    pass\n$x\n", "3"},
      {"x = 1\nwhile True:\n  x = 2\n  break\n$x\n", "3"},
      {"while True:\n  x = 2\n  if a:\n    break\n$x\n", "2"},
      {"x = 1\nwhile 1:\n  x = 2\n  if x: break\n$x\n", "3"},
      {"while True:\n  if a:\n    x = 2\n    break\n$x\n", "3"},
      {"while True:\n  if a:\n    break\n  x = 2\n$x\n", "4?"},
  });
}

TEST(Flow, KnowsThatATryMayEndAnywhere) {
  Check({
      {"x = 1\ntry:\n  x = 2\nexcept E:\n  $x\n", "1 3"},
      {"x = 1\ntry:\n  x = 2\n  x = 3\nexcept E:\n  $x\n", "1 3 4"},
      {"x = 1\ntry:\n  x = 2\nexcept E:\n  pass\n$x\n", "1 3"},
      {"x = 1\ntry:\n  x = 2\nexcept E:\n  x = 3\n$x\n", "3 5"},
      {"x = 1\ntry:\n  x = 2\n  x = 3\nexcept E:\n  pass\n$x\n", "1 3 4"},
      {"try:\n  x = 1\nexcept E:\n  raise\nelse:\n  x = 2\n$x\n", "6"},
      {"x = 1\ntry:\n  x = 2\nexcept E:\n  pass\nelse:\n  $x\n", "3"},
      {"x = 1\ntry:\n  x = 2\nfinally:\n  $x\n", "1 3"},
      {"x = 1\ntry:\n  x = 2\nfinally:\n  pass\n$x\n", "3"},
      {"x = 1\ntry:\n  x = 2\nfinally:\n  x = 3\n$x\n", "5"},
      {"x = 1\ntry:\n  pass\nexcept E:\n  pass\nelse:\n  x = 2\n$x\n", "1 7"},
      {"x = 1\ntry:\n  $x\n  x = 2\nexcept E:\n  x = 3\n", "1"},
      {"try:\n  import x\nexcept ImportError:\n  x = None\n$x\n", "2 4"},
      {"def f():\n  try:\n    x = 1\n  except E:\n    return\n  $x\n", "3"},
      {"try:\n  pass\nexcept E as x:\n  $x\n", "3"},
      {"x = 1\ntry:\n  x = 2\nexcept $x:\n  pass\n", "1 3"},
  });
}

TEST(Flow, EntersManagers) {
  Check({
      {"x = 1\nwith a as x:\n  $x\n", "2"},
      {"x = 1\nwith a as x:\n  pass\n$x\n", "2"},
      {"x = 1\nwith $x as x:\n  pass\n", "1"},
      {"with a as x, $x as y:\n  pass\n", "1"},
      {"x = 1\nwith a:\n  x = 2\n$x\n", "3"},
  });
}

TEST(Flow, MatchesCaseAfterCase) {
  Check({
      {"x = 1\nmatch a:\n  case 1:\n    x = 2\n$x\n", "1 4"},
      {"x = 1\nmatch a:\n  case 1:\n    x = 2\n  case _:\n    x = 3\n$x\n", "4 6"},
      {"x = 1\nmatch a:\n  case [x, 1]:\n    $x\n", "3"},
      {"x = 1\nmatch a:\n  case 1:\n    x = 2\n  case 2:\n    $x\n", "1"},
      {"x = 1\nmatch $x:\n  case 1:\n    x = 2\n", "1"},
      {"def f(a):\n  match a:\n    case 1:\n      x = 1\n    case _:\n      return\n  $x\n", "4"},
  });
}

TEST(Flow, TakesWhatAScopeEndsWithForWhatRunsLater) {
  Check({
      {"x = 1\ndef f():\n  return $x\nx = 2\n", "4"},
      {"x = 1\ndef f():\n  return $x\nif a:\n  x = 2\n", "1 5"},
      {"x = 1\ny = lambda: $x\nx = 2\n", "3"},
      {"x = 1\ny = [$x for i in a]\nx = 2\n", "1"},
      {"x = 1\nclass C:\n  y = $x\nx = 2\n", "1"},
      {"x = 1\ndef f(a=$x): pass\nx = 2\n", "1"},
      {"x = 1\n@$x\ndef f(): pass\nx = 2\n", "1"},
      {"x = 1\ndef f():\n  global x\n  x = 2\ndef g():\n  $x\n", "1 4"},
      {"def f():\n  x = 1\n  def g():\n    nonlocal x\n    x = 2\n  def h():\n    $x\n", "2 5"},
  });
}

TEST(Flow, CountsParametersAsBoundInFront) {
  Check({
      {"def f(x):\n  $x\n", "1"},
      {"def f(x):\n  x = 1\n  $x\n", "2"},
      {"def f(x):\n  if x:\n    x = 1\n  $x\n", "1 3"},
      {"y = lambda x: $x\n", "1"},
      {"y = [$x for x in a]\n", "1"},
  });
}

TEST(Flow, EndsInDeepPrograms) {
  std::string text = "x = 0\n";
  for (int i = 0; i < 90; ++i) text += std::string(static_cast<size_t>(i), ' ') + "if a:\n";
  text += std::string(90, ' ') + "x = 1\n$x\n";
  EXPECT_EQ(Reaching(text), "1 92");
  std::string loops = "x = 0\n";
  for (int i = 0; i < 20; ++i) {
    const std::string indent(static_cast<size_t>(i), ' ');
    loops += indent + "for i in a:\n" + indent + " if i: break\n" + indent + " if i: continue\n";
  }
  EXPECT_EQ(Reaching(loops + std::string(20, ' ') + "x = 1\n$x\n"), "1 62");
  std::string chain = "x = 0\nif a: x = 1\n";
  for (int i = 0; i < 10000; ++i) chain += "elif a: pass\n";
  EXPECT_EQ(Reaching(chain + "$x\n"), "1 2");
}

}  // namespace
}  // namespace quillet
