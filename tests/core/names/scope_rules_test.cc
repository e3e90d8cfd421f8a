// What the language does not let names of a scope do, of sources that are read completely: those that Python's own
// compilers reject, with what these say and where, and others like them that they take.
#include "names/scope_rules.h"

#include <gtest/gtest.h>

#include <string>

#include "analysis/file_analyzer.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/errors_text.h"

namespace quillet {
namespace {

struct Case {
  const char* source;
  const char* errors;  // line:column and message
};

FileAnalyzer AnalyzerFor(Version version) {
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = testing::AnalyzerOptions(version);
  options.reads_completely = true;
  options.make_name_rules = MakeScopeRules;
  return FileAnalyzer(options);
}

TEST(ScopeRules, OfPython3) {
  FileAnalyzer files = AnalyzerFor(Version::Of(3, 12));
  const Case cases[] = {
      {"def f():\n  x = 1\n  global x\n", "3:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  print(x)\n  global x\n", "3:3 name 'x' is used prior to global declaration"},
      {"def f(x):\n  global x\n", "2:3 name 'x' is parameter and global"},
      {"def f():\n  nonlocal x\n", "2:3 no binding for nonlocal 'x' found"},
      {"def f():\n  x = 1\n  def g():\n    nonlocal x\n    x = 2\n", ""},
      {"nonlocal x\n", "1:1 nonlocal declaration not allowed at module level"},
      {"class A:\n  x = 1\n  def g(self):\n    nonlocal x\n", "4:5 no binding for nonlocal 'x' found"},
      {"def f():\n  def g():\n    x = 1\n    global x\n", "4:5 name 'x' is assigned to before global declaration"},
      {"def f():\n  global x\n  x: int = 1\n", "3:3 annotated name 'x' can't be global"},
      {"def f():\n  x: int\n  global x\n", "3:3 annotated name 'x' can't be global"},
      {"async def f():\n  yield 1\n  return 2\n", "3:3 'return' with value in async generator"},
      {"def f():\n  yield 1\n  return 2\n", ""},
      {"async def f():\n  def g():\n    yield 1\n  return 2\n", ""},
      {"x = 1\nglobal x\n", "2:1 name 'x' is assigned to before global declaration"},
      {"class A:\n  x = 1\n  global x\n", "3:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  if a:\n    x = 1\n  # words\n\n  global y, x\n",
       "6:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  class B: pass\n  x = lambda: y\n  global y\n", ""},
      {"def f():\n  x = [y for y in z]\n  global y\n", ""},
      {"def f():\n  import x.y\n  global x\n", ""},
      {"def f(a=x):\n  global x\n", ""},
      {"def x():\n  global x\n", ""},
      {"async def x(y):\n  global x\n", ""},
      {"def f():\n  global x\n  global x\n", ""},
      {"def f():\n  global x; x = 1\n", ""},
      {"def f():\n  x = 1; global x\n", "2:10 name 'x' is assigned to before global declaration"},
      {"def f():\n  global x\n  nonlocal x\n",
       "2:3 name 'x' is nonlocal and global; 3:3 name 'x' is nonlocal and global"},
      {"def f():\n  def g():\n    nonlocal y\n  y = 1\n", ""},
      {"def f(y):\n  def g():\n    def h():\n      nonlocal y\n", ""},
      {"def f():\n  class A:\n    y = 1\n    def g(self):\n      nonlocal y\n",
       "5:7 no binding for nonlocal 'y' found"},
      {"def f():\n  global y\n  def g():\n    nonlocal y\n", "4:5 no binding for nonlocal 'y' found"},
      {"def f():\n  f'{x}'\n  global x\n", "3:3 name 'x' is used prior to global declaration"},
      {"def f():\n  'x'\n  global x\n", ""},
      {"def f():\n  a.x\n  global x\n", ""},
      {"def f():\n  for x in y: pass\n  global x\n", "3:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  with a as x: pass\n  global x\n", "3:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  try: pass\n  except E as x: pass\n  global x\n",
       "4:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  del x\n  global x\n", "3:3 name 'x' is assigned to before global declaration"},
      {"def f():\n  (x := 1)\n  global x\n", "3:3 name 'x' is assigned to before global declaration"},
      {"class A:\n  nonlocal x\n", "2:3 no binding for nonlocal 'x' found"},
      {"def f():\n  class A:\n    nonlocal x\n", "3:5 no binding for nonlocal 'x' found"},
      {"def f():\n  x = 1\n  class A:\n    nonlocal x\n    x = 2\n", ""},
      {"def f():\n  global x\n\n  # words\n\n  x: int = 1\n", "6:3 annotated name 'x' can't be global"},
      {"async def f():\n  yield 1\n\n  # words\n\n  return 2\n", "6:3 'return' with value in async generator"},
      {"def f():\n  def g():\n    nonlocal x\n\n# words\n  x = 1\n", ""},
      {"def f:\n  def g():\n    nonlocal x\n", "1:6 expected '('; 3:5 no binding for nonlocal 'x' found"},
      {"def f(a) b:\n  def g():\n    nonlocal x\n", "1:10 expected ':'; 3:5 no binding for nonlocal 'x' found"},
      {"def f[T]():\n  nonlocal T\n", "2:3 nonlocal binding not allowed for type parameter 'T'"},
      {"def f():\n  global \u00E9\n  \u00E9 = 1\n", ""},
      {"def f():\n  \u00E9 = 1\n  global \u00E9\n", "3:3 name '\u00E9' is assigned to before global declaration"},
      {"if a:\n  def f():\n    x = 1\n    if b:\n      global x\n",
       "5:7 name 'x' is assigned to before global declaration"},
      {"def f():\n  x()\ndef g():\n  global x\n", ""},
      {"def f(): x = 1; global x\n", "1:17 name 'x' is assigned to before global declaration"},
      {"async def f():\n  return 2\n  if a:\n    yield\n", "2:3 'return' with value in async generator"},
      {"async def f():\n  return\n  yield\n", ""},
      {"async def f():\n  return 1\n  lambda: (yield)\n", ""},
      {"async def f():\n  for a in (yield): b\n  return 1\n", "3:3 'return' with value in async generator"},
  };
  for (const Case& one : cases) EXPECT_EQ(testing::ErrorsOf(files, one.source), one.errors) << one.source;
}

TEST(ScopeRules, OfPython2) {
  FileAnalyzer files = AnalyzerFor(Version::Of(2, 7));
  const Case cases[] = {
      {"def f():\n  def g(): return x\n  x = 1\n  del x\n",
       "4:7 can not delete variable 'x' referenced in nested scope"},
      {"def f():\n  yield 1\n  return 2\n", "3:3 'return' with argument inside generator"},
      {"def f():\n  exec a\n  def g(): return b\n",
       "2:3 unqualified exec is not allowed in function 'f' because it contains a nested function with free variables"},
      {"def f():\n  from a import *\n  def g(): return b\n",
       "2:3 import * is not allowed in function 'f' because it contains a nested function with free variables"},
      {"def f():\n  x = 1\n  global x\n", ""},
      {"def f(x):\n  global x\n", "2:3 name 'x' is parameter and global"},
      {"def f():\n  x = 1\n  del x\n  return lambda: x\n",
       "3:7 can not delete variable 'x' referenced in nested scope"},
      {"def f():\n  x = 1\n  del x\n", ""},
      {"def f():\n  from a import *\n", ""},
      {"def f():\n  exec a in b\n  def g(): return b\n", ""},
      {"def f():\n  def g(): b = 1\n  exec a\n", ""},
      {"def f():\n  exec a\n  x = lambda: b\n",
       "2:3 unqualified exec is not allowed in function 'f' because it contains a nested function with free variables"},
      {"class A:\n  from a import *\n  def g(): return b\n", ""},
      {"def f():\n  x = (y for y in z)\n  exec a\n", ""},
      {"def f():\n  x = (y for y in z if w)\n  exec a\n",
       "3:3 unqualified exec is not allowed in function 'f' because it contains a nested function with free variables"},
      {"def f(): return 1; yield\n", "1:10 'return' with argument inside generator"},
      {"def f():\n  return\n  yield 1\n", ""},
      {"def f():\n  class A:\n    def g(self): return x\n  del x\n",
       "4:7 can not delete variable 'x' referenced in nested scope"},
  };
  for (const Case& one : cases) EXPECT_EQ(testing::ErrorsOf(files, one.source), one.errors) << one.source;
}

}  // namespace
}  // namespace quillet
