// Questions about programs of a few files, at marked places.
#include "workspace/questions.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "tests/core/support/program.h"

namespace quillet {
namespace {

using testing::Program;
using Words = std::vector<std::string>;

// ---- definitions ----

TEST(Definitions, OfAttributesThatAMakerOfInstancesSets) {
  Program program(
      "class A(object):\n"
      "  def __new__(cls, x):\n    obj = super().__new__(cls)\n    obj.x = x\n    other = []\n    other.y = 1\n"
      "    return obj\n"
      "  @classmethod\n  def made(cls):\n    new = cls(1)\n    new.z = 'z'\n    return new\n"
      "  def m(self):\n    self.$x\n    self.$z\n    self.$y\n");
  EXPECT_EQ(program.Say(program->Definitions(program[0].file, program[0].offset)), Words{"a.py:4:9"});
  EXPECT_EQ(program.Say(program->Definitions(program[1].file, program[1].offset)), Words{"a.py:11:9"});
  EXPECT_EQ(program.Types(1), "builtins.str");
  for (const Location& place : program->Definitions(program[2].file, program[2].offset))
    EXPECT_EQ(place.certainty, Certainty::kByName);
}

TEST(Definitions, OfWhatAClassHasBeforeItsMetaclass) {
  Program program(
      "class M(type):\n  def x(cls): pass\n  def y(cls): pass\nclass A(metaclass=M):\n  x = 1\nA.$x\nA.$y\n");
  EXPECT_EQ(program.Definitions(0), Words{"a.py:5:3"});
  EXPECT_EQ(program.Definitions(1), Words{"a.py:3:7"});
}

TEST(Definitions, OfWhatAModuleImportsFromItself) {
  Program program({
      {"p/__init__.py", ""},
      {"p/a.py", "class A:\n  def m(self): pass\nfrom p.a import A\nclass B(A): pass\n$A\n"},
      {"p/b.py", "from .a import B\nB().$m()\n"},
  });
  EXPECT_EQ(program.Types(0), "type[p.a.A]");
  EXPECT_EQ(program.Types(1), "def () -> None");
}

TEST(Definitions, LieInOtherFiles) {
  Program program({
      {"main.py",
       "import shop\nfrom shop import $Shop as S\nshop.$Shop\n$S().$total()\nimport $shop.tax\nshop.tax.$rate\n"},
      {"shop/__init__.py", "class Shop:\n  def total(self): pass\n"},
      {"shop/tax.py", "rate = 1\n"},
  });
  EXPECT_EQ(program.Definitions(0), Words{"shop/__init__.py:1:7"});
  EXPECT_EQ(program.Definitions(1), Words{"shop/__init__.py:1:7"});
  EXPECT_EQ(program.Definitions(2), Words{"shop/__init__.py:1:7"});
  EXPECT_EQ(program.Definitions(3), Words{"shop/__init__.py:2:7"});
  EXPECT_EQ(program.Definitions(4), Words{"shop/__init__.py:1:1"});
  EXPECT_EQ(program.Definitions(5), Words{"shop/tax.py:1:1"});
}

TEST(Definitions, FollowRelativeStarAndHandedOnImports) {
  Program program({
      {"main.py", "from pack import *\n$one\n$two\n$_hidden\nfrom pack import $deep\nfrom pack.inner.b import $top\n"},
      {"pack/__init__.py",
       "from .a import one, two as renamed\nfrom .a import *\nfrom .inner import deep\n_hidden = 1\n"},
      {"pack/a.py", "one = 1\ntwo = 2\n"},
      {"pack/inner/__init__.py", "from .b import deep\n"},
      {"pack/inner/b.py", "def deep(): pass\nfrom ..a import one as top\n"},
  });
  EXPECT_EQ(program.Definitions(0), Words{"pack/a.py:1:1"});
  EXPECT_EQ(program.Definitions(1), Words{"pack/a.py:2:1"});
  EXPECT_EQ(program.Definitions(2), Words{});
  EXPECT_EQ(program.Definitions(3), Words{"pack/inner/b.py:1:5"});
  EXPECT_EQ(program.Definitions(4), Words{"pack/a.py:1:1"});
}

TEST(Definitions, OfStarImportsAreThoseOfAll) {
  Program program({
      {"main.py", "from a import *\n$_listed\n$left_out\n$later\n$extended\n"},
      {"a.py",
       "__all__ = ['_listed']\n__all__ += ['later']\n__all__.extend(['extended'])\n"
       "_listed = left_out = later = extended = 1\n"},
  });
  EXPECT_EQ(program.Definitions(0), Words{"a.py:4:1"});
  EXPECT_EQ(program.Definitions(1), Words{});
  EXPECT_EQ(program.Definitions(2), Words{"a.py:4:22"});
  EXPECT_EQ(program.Definitions(3), Words{"a.py:4:30"});
}

TEST(Definitions, TakeBothSidesOfATriedImport) {
  Program program({
      {"main.py", "try:\n  from fast import f\nexcept ImportError:\n  from slow import f\n$f\n"},
      {"fast.py", "def f(): pass\n"},
      {"slow.py", "def f(): pass\n"},
  });
  EXPECT_EQ(program.Definitions(), (Words{"fast.py:1:5", "slow.py:1:5"}));
}

TEST(Definitions, ComeThroughRingsOfImports) {
  Program program({
      {"a.py", "from b import f\nfrom a import g\nimport a\n$f\n$g\na.a.a.$h\ndef h(): pass\n"},
      {"b.py", "from a import g\nfrom c import *\n"},
      {"c.py", "from b import *\ndef f(): pass\n"},
  });
  EXPECT_EQ(program.Definitions(0), Words{"c.py:2:5"});
  EXPECT_EQ(program.Definitions(1), Words{"a.py:2:15"});  // its own import is all that binds it
  EXPECT_EQ(program.Definitions(2), Words{"a.py:7:5"});
}

TEST(Definitions, OfNamespacesAndSubmodules) {
  Program program({
      {"main.py",
       "import space.one\nimport space.two as t\nspace.one.$x\nt.$y\nfrom space import $one\nfrom space.one import "
       "$x\n"},
      {"space/one.py", "x = 1\n"},
      {"library/space/two.py", "y = 1\n"},
  });
  EXPECT_EQ(program.Definitions(0), Words{"space/one.py:1:1"});
  EXPECT_EQ(program.Definitions(1), Words{"library/space/two.py:1:1"});
  EXPECT_EQ(program.Definitions(2), Words{"space/one.py:1:1"});
  EXPECT_EQ(program.Definitions(3), Words{"space/one.py:1:1"});
}

TEST(Definitions, DependOnTheVersion) {
  const char* const text = "import sys\nif sys.version_info[0] >= 3:\n  def f(): pass\nelse:\n  def f(): pass\n$f()\n";
  EXPECT_EQ(Program(text).Definitions(), Words{"a.py:3:7"});
  EXPECT_EQ(Program(text, Version::Of(2, 7)).Definitions(), Words{"a.py:5:7"});
}

TEST(Definitions, OfMembersDependOnTheVersion) {
  const char* const text =
      "import sys\nclass A:\n  if sys.version_info >= (3,):\n    def f(self): pass\n    x = 1\n  else:\n"
      "    def f(self): pass\n    x = 2\n  if sys.version_info > (4,):\n    y = 1\nA().$f()\nA.$x\nA.$y\n";
  Program three(text);
  EXPECT_EQ(three.Definitions(0), Words{"a.py:4:9"});
  EXPECT_EQ(three.Definitions(1), Words{"a.py:5:5"});
  EXPECT_EQ(three.Definitions(2), Words{"a.py:10:5"});
  Program two(text, Version::Of(2, 7));
  EXPECT_EQ(two.Definitions(0), Words{"a.py:7:9"});
  EXPECT_EQ(two.Definitions(1), Words{"a.py:8:5"});
}

TEST(Definitions, AreThoseThatReach) {
  EXPECT_EQ(Program("x = 1\nif a:\n  x = 2\n$x\n").Definitions(), (Words{"a.py:1:1", "a.py:3:3"}));
  EXPECT_EQ(Program("x = 1\nx = 2\n$x\n").Definitions(), Words{"a.py:2:1"});
  EXPECT_EQ(Program("def f(x): return $x\n").Definitions(), Words{"a.py:1:7"});
  EXPECT_EQ(Program("class A:\n  x = 1\n  def m(self): return $x\nx = 2\n").Definitions(), Words{"a.py:4:1"});
  EXPECT_EQ(Program("$nothing\n").Definitions(), Words{});
}

TEST(Definitions, OfAttributesGoByTheOrderOfBases) {
  Program program(
      "class A:\n  def m(self): self.x = 1\nclass B(A):\n  def m(self): pass\nB().$m\nB().$x\nA().$m\nA.m\n"
      "class C:\n  def __init__(self, y): pass\nC($y=1)\n");
  EXPECT_EQ(program.Definitions(0), Words{"a.py:4:7"});
  EXPECT_EQ(program.Definitions(1), Words{"a.py:2:21"});
  EXPECT_EQ(program.Definitions(2), Words{"a.py:2:7"});
  EXPECT_EQ(program.Definitions(3), Words{"a.py:10:22"});
}

TEST(Definitions, SayHowSureTheyAre) {
  // Nothing is known of the receiver: one that has the name is likely it, several are so by name only.
  EXPECT_EQ(Program("class A:\n  def one(self): pass\ndef f(x): x.$one()\n").Definitions(), Words{"a.py:2:7 likely"});
  EXPECT_EQ(
      Program("class A:\n  def m1(self): pass\nclass B:\n  def m1(self): pass\ndef f(x): x.$m1()\n").Definitions(),
      (Words{"a.py:2:7 by name", "a.py:4:7 by name"}));
  // `split` is a method of text as well.
  EXPECT_EQ(Program("class A:\n  def split(self): pass\ndef f(x): x.$split()\n").Definitions(),
            Words{"a.py:2:7 by name"});
  // By a call of its function.
  EXPECT_EQ(
      Program("class A:\n  def m(self): pass\nclass B:\n  def m(self): pass\ndef f(x): x.$m()\nf(A())\n").Definitions(),
      Words{"a.py:2:7 likely"});
  EXPECT_EQ(
      Program("class A:\n  def m(self): pass\nclass B:\n  def m(self): pass\ndef f(x: A): x.$m()\n").Definitions(),
      Words{"a.py:2:7"});
  // By what a lambda is given to, if all that it may be given to say so.
  const std::string head =
      "from typing import Callable\nclass A:\n  def m(self): pass\ndef f(x: Callable[[A], int]): pass\ndef g(x): "
      "pass\n";
  EXPECT_EQ(Program(head + "f(lambda x: x.$m())\n").Definitions(), Words{"a.py:3:7"});
  EXPECT_EQ(Program(head + "(f if c else g)(lambda x: x.$m())\n").Definitions(), Words{"a.py:3:7 likely"});
}

TEST(Definitions, OfStubsLieInTheirSources) {
  Program program({
      {"main.py", "import lib, only\nlib.$f\nlib.C().$m\nonly.$g\nlen.$x\n$len\n"},
      {"library/lib.py", "\ndef f(): pass\nclass C:\n  def m(self): pass\n"},
      {"library/lib.pyi", "def f() -> int: ...\nclass C:\n  def m(self) -> str: ...\n"},
      {"library/only.pyi", "def g() -> int: ...\n"},
  });
  EXPECT_EQ(program.Definitions(0), Words{"library/lib.py:2:5"});
  EXPECT_EQ(program.Definitions(1), Words{"library/lib.py:4:7"});
  EXPECT_EQ(program.Definitions(2), Words{"library/only.pyi:1:5"});
  EXPECT_EQ(program.Definitions(3), Words{});
  ASSERT_EQ(program.Definitions(4).size(), 1u);
  EXPECT_TRUE(program.Definitions(4)[0].starts_with("builtins.pyi:"));
}

// ---- references ----

TEST(References, AreFoundInTheWholeProject) {
  Program program({
      {"a.py", "class Shop:\n  def $total(self): return 1\n  def more(self): return self.total()\n"},
      {"b.py", "from a import Shop\nShop().total()\ndef f(shop: Shop): return shop.total\n"},
      {"c.py", "class Other:\n  def total(self): pass\nOther().total()\ntotal = 1\n# total\n'total'\n"},
  });
  EXPECT_EQ(program.References(), (Words{"a.py:2:7", "a.py:3:31", "b.py:2:8", "b.py:3:32"}));
  const std::vector<Location> found = program->References(program[0].file, program[0].offset);
  ASSERT_EQ(found.size(), 4u);
  EXPECT_EQ(found[0].role, "definition");
  EXPECT_EQ(found[0].kind, "function");
  EXPECT_EQ(found[2].role, "call");
  EXPECT_EQ(found[3].role, "read");
  EXPECT_EQ(program.Say(program->References(program[0].file, program[0].offset, false)),
            (Words{"a.py:2:7", "a.py:3:31"}));
}

TEST(References, SayWhatTheNameIsAndDoesThere) {
  Program program("import a\nclass $A:\n  x = 1\n  def f(self, b): self.y = b\nA().$f(A)\nA.$x = 2\nA().$y\n");
  const auto said = [&](size_t i) {
    Words words;
    for (const Location& found : program->References(program[i].file, program[i].offset))
      words.push_back(std::string(found.role) + " " + std::string(found.kind));
    return words;
  };
  EXPECT_EQ(said(0), (Words{"definition class", "call ", "read ", "read ", "call "}));
  EXPECT_EQ(said(1), (Words{"definition function", "call "}));
  EXPECT_EQ(said(2), (Words{"write variable", "write "}));
  EXPECT_EQ(said(3), (Words{"write ", "read "}));
}

TEST(References, AreTheSameFromEachOfThem) {
  Program program({
      {"a.py", "def $f(): pass\n__all__ = ['f']\n"},
      {"b.py", "from a import $f\n$f()\n"},
      {"c.py", "import a\na.$f()\n"},
  });
  const Words all = {"a.py:1:5", "a.py:2:13", "b.py:1:15", "b.py:2:1", "c.py:2:3"};
  for (size_t i = 0; i < program.places().size(); ++i) EXPECT_EQ(program.References(i), all) << i;
}

TEST(References, SayHowSureTheyAre) {
  Program program({
      {"a.py",
       "class A:\n  def $only(self): pass\nclass B:\n  def $both(self): pass\nclass C:\n  def both(self): pass\n"},
      {"b.py", "from a import A, B\ndef f(x):\n  x.only()\n  x.both()\nA().only()\nB().both()\n"},
  });
  EXPECT_EQ(program.References(0), (Words{"a.py:2:7", "b.py:3:5 likely", "b.py:5:5"}));
  EXPECT_EQ(program.References(1), (Words{"a.py:4:7", "b.py:4:5 by name", "b.py:6:5"}));
}

TEST(References, AreThoseOfEachFileWhereManyHaveTheName) {
  // Ways of saying and of not saying what `a.total` is. Asked alone, each is read whole.
  const Words ways = {
      "from a import total\ntotal()\n",
      "from b import total\ntotal()\n",
      "from c import total\ntotal()\n",
      "from star import *\ntotal()\n",
      "from star import *\ndef total(): pass\ntotal()\n",
      "from b import *\ntotal()\n",
      "import a\na.total()\nimport b\nb.total()\n",
      "import a as m\n(m.  # here\n  total())\n",
      "from a import (x,\n  # the sum\n  total as t)\nt()\n",
      "from c import other as total\ntotal()\n",
      "from b import x as total\ntotal()\n",
      "def total(): pass\ntotal()\nf(total=1)\n",
      "def f():\n  from a import total\n  return total\ntotal\n",
      "try:\n  from b import total\nexcept ImportError:\n  from a import total\ntotal\n",
      "from .a import total\ntotal\n",
      "from a import total\n__all__ = ['total']\n",
      "import total\ntotal\nfrom total import total\n",
      "def f(x: 'a.total'): pass\nimport a\n",
      "from a import total; total\n",
      "from a import (total\nx = total\n",
      "class C:\n  def total(self): return self.total\n",
  };
  const auto program_of = [&](size_t first, size_t last) {
    auto program = std::make_unique<Program>(std::initializer_list<std::pair<std::string_view, std::string_view>>{
        {"a.py", "def $total(): pass\n"},
        {"b.py", "def total(): pass\nx = 1\n"},
        {"c.py", "from a import total\nother = total\n"},
        {"star.py", "from c import *\n"},
        {"total.py", "from a import total\n"}});
    for (size_t i = first; i < last; ++i) program->Open("way" + std::to_string(i) + ".py", ways[i % ways.size()]);
    return program;
  };
  const size_t count = 2 * ways.size();
  Words apart;
  for (size_t i = 0; i < count; ++i) {
    for (std::string& said : program_of(i, i + 1)->References())
      if (std::ranges::find(apart, said) == apart.end()) apart.push_back(std::move(said));
  }
  Words together = program_of(0, count)->References();
  std::ranges::sort(apart);
  std::ranges::sort(together);
  EXPECT_EQ(together, apart);
  EXPECT_GT(together.size(), count);
}

TEST(References, OfOtherClassesAreNeverCertain) {
  // What derives from what is not known may have any attribute of its own.
  EXPECT_EQ(
      Program("from nowhere import U\nclass A:\n  def $m(self): pass\nclass B(U, A): pass\nB().m()\n").References(),
      (Words{"a.py:3:7", "a.py:5:5 likely"}));
  // One of two.
  EXPECT_EQ(
      Program("class A:\n  def $m(self): pass\nclass B:\n  def m(self): pass\ndef f(x: A | B): x.m()\n").References(),
      (Words{"a.py:2:7", "a.py:5:20"}));
  // What overrides it is another.
  EXPECT_EQ(Program("class A:\n  def $m(self): pass\nclass B(A):\n  def m(self): super().m()\nB().m()\n").References(),
            (Words{"a.py:2:7", "a.py:4:24"}));
  EXPECT_EQ(
      Program("class A:\n  def $m(self): pass\nclass B:\n  def m(self): pass\nx = A() if c else B()\nx = B()\nx.m()\n")
          .References(),
      Words{"a.py:2:7"});
  EXPECT_EQ(Program("class A:\n  def $m(self): pass\ndef f(x):\n  if isinstance(x, A): x.m()\n").References(),
            (Words{"a.py:2:7", "a.py:4:26"}));
}

TEST(References, OfItemsThatMayBeSomethingElseAreNotCertain) {
  const std::string head = "class A:\n  def $m(self): pass\ndef f(x):\n";
  for (const char* use : {"  for y in (A(), x): y.m()\n", "  [A(), x][1].m()\n", "  {'a': A(), **x}['b'].m()\n",
                          "  {A(), x}.pop().m()\n", "  y = []\n  y.append(A())\n  y[0].m()\n",
                          "  for y in [z for z in [A(), x]]: y.m()\n", "  a, *b = A(), A(), x\n  b[0].m()\n"}) {
    const std::vector<std::string> said = Program(head + use).References();
    ASSERT_EQ(said.size(), 2u) << use;
    EXPECT_TRUE(said[1].ends_with(" likely")) << use << said[1];
  }
  for (const char* use : {"  for y in (A(), A()): y.m()\n", "  [A()][0].m()\n", "  (x, A())[1].m()\n"}) {
    const std::vector<std::string> said = Program(head + use).References();
    ASSERT_EQ(said.size(), 2u) << use;
    EXPECT_FALSE(said[1].ends_with(" likely")) << use << said[1];
  }
}

TEST(Definitions, AreAsSureWhateverWasAskedBefore) {
  // Each of them is found by way of another.
  const std::string text =
      "class Node:\n"
      "  def __init__(self): self.next = Node()\n"
      "  def last(self): return self.next.last() if self.next else self\n"
      "  def m(self): return self\n"
      "def a(n): return b(n) if n else Node()\n"
      "def b(n): return c(n).last() if n else Node()\n"
      "def c(n): return a(n).$m() if n else b(n).next\n"
      "x = Node()\n"
      "while x:\n"
      "  x = x.next\n"
      "  x.$m()\n"
      "a(1).$m()\n"
      "b(1).$m()\n"
      "c(1).$m()\n"
      "x.last().$m()\n";
  std::vector<std::string> first;
  for (size_t begin = 0; begin < 6; ++begin) {
    Program program(text);
    std::vector<std::string> said(6);
    for (size_t i = 0; i < 6; ++i) {
      const size_t at = (begin + i) % 6;
      const Words found = program.Definitions(at);
      said[at] = found.empty() ? "" : found.front();
    }
    if (first.empty()) first = said;
    EXPECT_EQ(said, first) << begin;
  }
  EXPECT_EQ(first, std::vector<std::string>(6, "a.py:4:7"));
}

TEST(References, AreTheSameWhateverWasAskedBefore) {
  // What is given to `f` leads through a file that is too long to be read for a guess, first or later.
  const std::string way = "# " + std::string(size_t{4} << 20, '-') +
                          "\nfrom a import A\nfrom b import f\ndef g(y): f(y)\ng(A())\nA().m()\n";
  Program program({{"a.py", "class A:\n  def $m(self): pass\nclass B:\n  def m(self): pass\n"},
                   {"b.py", "def f(x):\n  x.$m()\n"},
                   {"c.py", way}});
  const Words references = {"a.py:2:7", "b.py:2:5 by name", "c.py:6:5"};
  const Words definitions = {"a.py:2:7 by name", "a.py:4:7 by name"};
  for (int i = 0; i < 2; ++i) {
    EXPECT_EQ(program.References(), references) << i;
    EXPECT_TRUE(program->was_bounded());
    EXPECT_EQ(program.Definitions(1), definitions) << i;
  }
}

TEST(References, OfKeywordsAreThoseOfTheFunctionThatIsCalled) {
  EXPECT_EQ(Program("def f($x): pass\ndef g(x): pass\nf(x=1)\ng(x=1)\n").References(), (Words{"a.py:1:7", "a.py:3:3"}));
  EXPECT_EQ(Program("class A:\n  def __init__(self, $x): self.x = x\nA(x=1).x\n").References(),
            (Words{"a.py:2:22", "a.py:2:35", "a.py:3:3"}));
  EXPECT_EQ(Program("from dataclasses import dataclass\n@dataclass\nclass A:\n  $x: int\nA(x=1).x\n").References(),
            (Words{"a.py:4:3", "a.py:5:3", "a.py:5:8"}));
}

TEST(References, OfParametersAreWhatIsGivenToThemInOtherFiles) {
  const std::string import = "from a import f\n";
  Program program({{"a.py", "def f($x): return x\n"},
                   {"b.py", import + "f(x=1)\n"},
                   {"c.py", import + "f(x = 1)\n"},
                   {"d.py", import + "f(x  # why\n  =1)\n"},
                   {"e.py", import + "f(x\\\n=1)\n"},
                   {"g.py", import + "x = 1\ny.x = f(x == 1)\n"},
                   {"h.py", import + "f(xx=1, x)\n"}});
  EXPECT_EQ(program.References(), (Words{"a.py:1:7", "a.py:1:18", "b.py:2:3", "c.py:2:3", "d.py:2:3", "e.py:2:3"}));
}

TEST(References, OfModulesAreWhatImportsThem) {
  Program program({
      {"main.py", "import pack.$a\nfrom pack import a as other\nfrom pack.a import x\npack.a.x\nother.x\n"},
      {"pack/__init__.py", ""},
      {"pack/a.py", "x = 1\n"},
  });
  EXPECT_EQ(program.References(),
            (Words{"main.py:1:13", "main.py:2:18", "main.py:3:11", "main.py:4:6", "pack/a.py:1:1"}));
}

TEST(References, OfVariablesAreThoseOfTheirScope) {
  EXPECT_EQ(Program("x = 1\ndef f():\n  $x = 2\n  return x\nprint(x)\n").References(),
            (Words{"a.py:3:3", "a.py:4:10"}));
  EXPECT_EQ(Program("$x = 1\ndef f():\n  global x\n  x = 2\nclass C:\n  x = 3\n").References(),
            (Words{"a.py:1:1", "a.py:3:10", "a.py:4:3"}));
  EXPECT_EQ(Program("def f($x):\n  return lambda: x\nf(x=1)\nx = 2\n").References(),
            (Words{"a.py:1:7", "a.py:2:18", "a.py:3:3"}));
  EXPECT_EQ(Program("y = [$x for x in x]\nx = 1\n").References(), (Words{"a.py:1:6", "a.py:1:12"}));
}

TEST(References, OfAttributesThatMethodsSet) {
  Program program(
      "class A:\n  def __init__(self):\n    self.$x = 1\n  def m(self):\n    self.x += 1\nclass B(A):\n  def n(self):\n"
      "    return self.x\nclass C:\n  def __init__(self): self.x = 1\n");
  EXPECT_EQ(program.References(), (Words{"a.py:3:10", "a.py:5:10", "a.py:8:17"}));
}

TEST(References, OfNamesInSlots) {
  Program program(
      "class A:\n  __slots__ = ('x', \"y\")\n  def m(self): return self.$x\nA().x\nA().$y\nclass B:\n"
      "  __slots__ = ['x']\n  def __init__(self): self.$x = 1\nA().$z\n");
  EXPECT_EQ(program.Definitions(0), (Words{"a.py:2:17"}));
  EXPECT_EQ(program.References(0), (Words{"a.py:2:17", "a.py:3:28", "a.py:4:5"}));
  EXPECT_EQ(program.Definitions(1), (Words{"a.py:2:22"}));
  EXPECT_EQ(program.Definitions(2), (Words{"a.py:8:28"}));
  EXPECT_EQ(program.References(2), (Words{"a.py:7:17", "a.py:8:28"}));
  EXPECT_EQ(program.Definitions(3), Words());
}

TEST(References, InALibraryAreThoseOfTheFilesThatAreOpen) {
  Program program({
      {"a.py", "from lib import $total\ntotal()\n"},
      {"library/lib.py", "def total(): pass\ntotal()\n"},
      {"library/more.py", "from lib import total\ntotal()\n"},
  });
  EXPECT_EQ(program.References(), (Words{"library/lib.py:1:5", "a.py:1:17", "a.py:2:1"}));
  program.Open("library/lib.py", "def total(): pass\ntotal()\n");
  program.Open("library/more.py", "from lib import total\ntotal()\n");
  EXPECT_EQ(program.References(), (Words{"library/lib.py:1:5", "library/lib.py:2:1", "library/more.py:1:17",
                                         "library/more.py:2:1", "a.py:1:17", "a.py:2:1"}));
}

TEST(Definitions, OfParametersOfTestsAreTheirFixtures) {
  Program program(
      "import pytest\n@pytest.fixture\ndef shop(): pass\ndef test($shop, x):\n  $shop, $x\n  shop = 1\n  $shop\n"
      "def plain($shop): pass\n");
  EXPECT_EQ(program.Definitions(0), (Words{"a.py:4:10", "a.py:3:5 likely"}));
  EXPECT_EQ(program.Definitions(1), (Words{"a.py:4:10", "a.py:3:5 likely"}));
  EXPECT_EQ(program.Definitions(2), (Words{"a.py:4:16"}));
  EXPECT_EQ(program.Definitions(3), (Words{"a.py:6:3"}));
  EXPECT_EQ(program.Definitions(4), (Words{"a.py:8:11"}));
}

TEST(Definitions, OfKeysThatAreGotten) {
  Program program(
      "from typing import TypedDict\nclass M(TypedDict):\n  name: str\ndef f(m: M):\n  m.get('$name')\n  m['$name']\n"
      "  m.get('$other')\n");
  EXPECT_EQ(program.Definitions(0), (Words{"a.py:3:3"}));
  EXPECT_EQ(program.Definitions(1), (Words{"a.py:3:3"}));
  EXPECT_EQ(program.Definitions(2), Words());
}

TEST(Definitions, OfPrivateMembersAreFoundAsSpelled) {
  Program program(
      "class A:\n  __x = 1\n  _A__x = ''\n  _A__y = 1\n  def m(self):\n    self.$__x\n    self.$_A__x\n"
      "    self.$_A__y\nA.$_A__x\n");
  EXPECT_EQ(program.Definitions(0), (Words{"a.py:2:3", "a.py:3:3"}));
  EXPECT_EQ(program.Definitions(1), (Words{"a.py:2:3", "a.py:3:3"}));
  EXPECT_EQ(program.Definitions(2), Words{"a.py:4:3"});
  EXPECT_EQ(program.Definitions(3), (Words{"a.py:2:3", "a.py:3:3"}));
  EXPECT_EQ(program.Types(1), "builtins.str");
}

TEST(Definitions, OfKeysThatSomeOfTheTypesHave) {
  Program program(
      "from typing import TypedDict\nclass M(TypedDict):\n  name: str\n  age: int\nclass N(TypedDict):\n  size: int\n"
      "  name: str\ndef f(m: M | int | N):\n  m['$name']\n  m['$size']\n  m['$age']\n");
  EXPECT_EQ(program.Definitions(0), (Words{"a.py:3:3", "a.py:7:3"}));
  EXPECT_EQ(program.Definitions(1), (Words{"a.py:6:3"}));
  EXPECT_EQ(program.Definitions(2), (Words{"a.py:4:3"}));
}

TEST(Definitions, OfKeysAreThoseOfWhatIsExpected) {
  Program program(
      "from typing import TypedDict\nclass M(TypedDict):\n  name: str\n  inner: 'M'\ndef f(m: M, n=0): pass\n"
      "class C:\n  def g(self, m: M): pass\nx: M = {'$name': ''}\nf({'$name': ''})\nf(n=1, m={'$name': ''})\n"
      "f({'inner': {'$name': ''}})\nC().g({'$name': ''})\nf(0, {'$name': ''})\nf(n={'$name': ''})\n"
      "y = {'$name': ''}\n(f, {'$name': ''})\n");
  for (size_t i = 0; i < program.places().size(); ++i)
    EXPECT_EQ(program.Definitions(i), i < 5 ? Words{"a.py:3:3"} : Words()) << i;
}

// ---- renames ----

Words Edited(Program& program, Text name, bool only_certain = true, size_t place = 0) {
  const Rename rename = program->RenameTo(program[place].file, program[place].offset, name, only_certain);
  if (!rename.problem.empty()) return {rename.problem};
  Words edits;
  for (const TextEdit& edit : rename.edits) {
    EXPECT_EQ(edit.text, name);
    edits.push_back(program.Say(edit.file, edit.begin) + "+" + std::to_string(edit.end - edit.begin));
  }
  return edits;
}

TEST(Renames, RefuseWhatMayBeGivenByUnseenKeywords) {
  for (const char* text : {"def f(a, $b): return b\ndef g(**options): return f(1, **options)\ng(b=2)\n",
                           "class A:\n  def m(self, $b): return b\nA().m(**{'b': 1})\n"}) {
    Program program(text);
    const Rename rename = program->RenameTo(program[0].file, program[0].offset, "other", true);
    EXPECT_TRUE(rename.edits.empty()) << text;
    EXPECT_NE(rename.problem.find("'b' may be given by '**' in "), std::string::npos) << rename.problem;
    EXPECT_FALSE(program->RenameTo(program[0].file, program[0].offset, "other", false).edits.empty()) << text;
  }
  Program handed("def f($a): return a\ndef call(g, **given): return g(**given)\ncall(f, a=1)\n");
  EXPECT_EQ(handed.References(), (Words{"a.py:1:7", "a.py:1:18", "a.py:3:9 likely"}));
  EXPECT_TRUE(handed->RenameTo(handed[0].file, handed[0].offset, "other", true).edits.empty());
  Program program("def f($a, *, b): return a\nf(a=1, b=2)\n");
  EXPECT_EQ(program->RenameTo(program[0].file, program[0].offset, "other", true).edits.size(), 3u);
}

TEST(Renames, ChangeNamesInSlots) {
  Program program("class A:\n  __slots__ = 'x', 'y'\n  def m(self): self.$x = 1\n");
  EXPECT_EQ(Edited(program, "new"), (Words{"a.py:2:16+1", "a.py:3:21+1"}));
}

TEST(Renames, ChangeWhatIsCertain) {
  Program program({
      {"a.py", "class A:\n  def $only(self): pass\n__all__ = ['A']\n"},
      {"b.py", "from a import A as X\nX().only()\ndef f(x): x.only()\n"},
  });
  EXPECT_EQ(Edited(program, "new"), (Words{"a.py:2:7+4", "b.py:2:5+4"}));
  EXPECT_EQ(Edited(program, "new", false), (Words{"a.py:2:7+4", "b.py:2:5+4", "b.py:3:13+4"}));
}

// The rename of the first place of one file, or why it cannot be.
Words EditedIn(Text text, Text name = "new") {
  Program program(text);
  return Edited(program, name);
}

TEST(Renames, TakeOverridesAlong) {
  const Words all{"a.py:2:7+1", "a.py:4:7+1", "a.py:4:24+1", "a.py:5:5+1", "a.py:6:5+1"};
  EXPECT_EQ(EditedIn("class A:\n  def $m(self): pass\nclass B(A):\n  def m(self): super().m()\nB().m()\nA().m()\n"),
            all);
  EXPECT_EQ(EditedIn("class A:\n  def m(self): pass\nclass B(A):\n  def $m(self): super().m()\nB().m()\nA().m()\n"),
            all);
  // Attributes, too, and what stands beside in another class of the same base.
  EXPECT_EQ(EditedIn("class A:\n  x = None\nclass B(A):\n  $x = 'b'\nclass C(A):\n  def f(self): self.x = 1\nA.x\n"),
            (Words{"a.py:2:3+1", "a.py:4:3+1", "a.py:6:21+1", "a.py:7:3+1"}));
  // By way of a class that has none itself.
  Program far({{"a.py", "class A:\n  def $m(self): pass\n"},
               {"b.py", "from a import A\nclass B(A): pass\n"},
               {"c.py", "import b\nclass C(b.B):\n  def m(self): pass\n"},
               {"d.py", "class D:\n  def m(self): pass\n"}});
  EXPECT_EQ(Edited(far, "new"), (Words{"a.py:2:7+1", "c.py:3:7+1"}));
  // Two that a third derives from are one: what either calls is the other's.
  Program joined({{"a.py", "class A:\n  def $m(self): pass\n"},
                  {"b.py", "class B:\n  def m(self): pass\n"},
                  {"c.py", "import a, b\nclass C(a.A, b.B): pass\n"}});
  EXPECT_EQ(Edited(joined, "new"), (Words{"a.py:2:7+1", "b.py:2:7+1"}));
  // References leave them out.
  EXPECT_EQ(far.References(), Words{"a.py:2:7"});
}

TEST(Renames, LeavePrivateNamesOfOtherClasses) {
  EXPECT_EQ(EditedIn("class A:\n  def f(self): self.$__x = 1\nclass B(A):\n  def g(self): self.__x = 2\n", "__y"),
            Words{"a.py:2:21+3"});
}

TEST(Renames, TakeAlongWhatElseAPlaceMeans) {
  EXPECT_EQ(EditedIn("class A:\n  def $m(self): pass\nclass B:\n  def m(self): pass\ndef f(x: A | B): x.m()\n"),
            (Words{"a.py:2:7+1", "a.py:4:7+1", "a.py:5:20+1"}));
  Program tried({{"a.py", "def $f(): pass\n"},
                 {"b.py", "def f(): pass\n"},
                 {"c.py", "try:\n  from a import f\nexcept ImportError:\n  from b import f\nf()\n"}});
  EXPECT_EQ(Edited(tried, "new"), (Words{"a.py:1:5+1", "b.py:1:5+1", "c.py:2:17+1", "c.py:4:17+1", "c.py:5:1+1"}));
  // What is outside of the project has to keep its name.
  Program outside({{"a.py", "def $f(): pass\n"},
                   {"c.py", "try:\n  from lib import f\nexcept ImportError:\n  from a import f\n"},
                   {"library/lib.py", "def f(): pass\n"}});
  const Words said = Edited(outside, "new");
  ASSERT_EQ(said.size(), 1u);
  EXPECT_TRUE(said[0].starts_with("'f' is something else as well, which cannot be renamed, in ")) << said[0];
  EXPECT_TRUE(said[0].ends_with("c.py, at line 2")) << said[0];
  EXPECT_EQ(Edited(outside, "new", false).size(), 3u);
}

TEST(Renames, TakeAlongWhatClassesLeaveToThoseBelow) {
  const std::string text =
      "class M:\n  def go(self): self.m()\nclass A(M):\n  def $m(self): pass\nclass B(M):\n  def m(self): pass\n";
  EXPECT_EQ(Program(text).References(), (Words{"a.py:2:22 likely", "a.py:4:7"}));
  EXPECT_EQ(EditedIn(text), (Words{"a.py:2:22+1", "a.py:4:7+1", "a.py:6:7+1"}));
}

TEST(Renames, TakeParametersOfOverridesAlongThatKeywordsName) {
  const std::string head = "class A:\n  def m(self, $b): return b\nclass B(A):\n  def m(self, b): return b\n";
  EXPECT_EQ(EditedIn(head + "A().m(b=1)\n"),
            (Words{"a.py:2:15+1", "a.py:2:26+1", "a.py:4:15+1", "a.py:4:26+1", "a.py:5:7+1"}));
  EXPECT_EQ(EditedIn(head + "A().m(1)\n"), (Words{"a.py:2:15+1", "a.py:2:26+1"}));
  // Who makes an object knows its class.
  EXPECT_EQ(EditedIn("class A:\n  def __init__(self, $b): pass\nclass B(A):\n  def __init__(self, b): pass\nA(b=1)\n"),
            (Words{"a.py:2:22+1", "a.py:5:3+1"}));
}

TEST(Renames, RefuseWhatALibraryCallsByItsName) {
  const auto said = [](Text text) {
    Program program({{"a.py", text}, {"library/lib.py", "class L:\n  def m(self): pass\n"}});
    return Edited(program, "new");
  };
  const Words refused{"'m' overrides what 'lib.L' defines outside of the project"};
  EXPECT_EQ(said("import lib\nclass A(lib.L):\n  def $m(self): pass\n"), refused);
  EXPECT_EQ(said("import lib\nclass A(lib.L):\n  def m(self): pass\nclass B(A):\n  def $m(self): pass\n"), refused);
  EXPECT_EQ(said("import lib\nclass A:\n  def $m(self): pass\nclass B(A, lib.L): pass\n"), refused);
  EXPECT_EQ(said("import lib\nclass A:\n  def $m(self): pass\nclass B(A):\n  def n(self): pass\n"),
            Words{"a.py:3:7+1"});
}

TEST(Renames, RefuseNamesThatMeanSomethingElseThere) {
  // Above or below in the order of bases.
  EXPECT_EQ(EditedIn("class A:\n  def $m(self): pass\nclass B(A):\n  def new(self): pass\n"),
            Words{"'new' means something else already in 'a.B'"});
  EXPECT_EQ(EditedIn("class A:\n  def new(self): pass\nclass B(A):\n  def $m(self): pass\n"),
            Words{"'new' means something else already in 'a.A'"});
  const auto taken_at = [](Text text) {
    const Words said = EditedIn(text);
    const size_t line = said.empty() ? std::string::npos : said[0].find(", at line ");
    return line == std::string::npos ? std::string("not") : said[0].substr(line + 10);
  };
  // A function in between has it, or an inner one means that of outside.
  EXPECT_EQ(taken_at("$x = 1\ndef f():\n  new = 2\n  def g(): return x\n"), "3");
  EXPECT_EQ(taken_at("new = 1\ndef f():\n  $x = 2\n  def g(): return new\n"), "4");
  EXPECT_EQ(taken_at("$x = 1\ndef f(): return new\n"), "2");
  EXPECT_EQ(taken_at("def f($x):\n  def g():\n    new = 1\n  return x\n"), "not");
  EXPECT_EQ(taken_at("def f($x):\n  def g():\n    global new\n    new = 1\n  return x\n"), "not");
  EXPECT_EQ(taken_at("class A:\n  $x = 1\n  def m(self): return new\n"), "not");
  EXPECT_EQ(taken_at("$x = 1\nclass A:\n  new = 1\n  def m(self): return x\n"), "not");
  EXPECT_EQ(taken_at("$x = 1\nclass A:\n  new = x\n"), "3");
}

TEST(Renames, ChangeStringsThatNameFields) {
  EXPECT_EQ(EditedIn("from collections import namedtuple\nP = namedtuple('P', 'x y')\nP(1, y=2).$x\nP(x=1, y=2)\n"),
            (Words{"a.py:2:22+1", "a.py:3:11+1", "a.py:4:3+1"}));
}

TEST(Renames, LeaveOtherNamesOfImports) {
  Program program({
      {"a.py", "class $A: pass\n__all__ = ['A']\n"},
      {"b.py", "from a import A as X\nX()\n"},
      {"c.py", "from a import A\nA()\nimport a\na.A\n"},
  });
  EXPECT_EQ(Edited(program, "New"),
            (Words{"a.py:1:7+1", "a.py:2:13+1", "b.py:1:15+1", "c.py:1:15+1", "c.py:2:1+1", "c.py:4:3+1"}));
}

TEST(Renames, AreRefusedWhereTheyCannotBe) {
  Program program("import $typing\n$x = 1\ny = x\n$len\n$nothing\n( $)\n");
  const auto problem = [&](size_t place, Text name) {
    const Rename rename = program->RenameTo(program[place].file, program[place].offset, name);
    EXPECT_TRUE(rename.edits.empty());
    return rename.problem;
  };
  EXPECT_EQ(problem(0, "other"), "'typing' is a module: rename its file");
  EXPECT_EQ(problem(1, "1x"), "'1x' is no name that code can use");
  EXPECT_EQ(problem(1, "class"), "'class' is no name that code can use");
  EXPECT_EQ(problem(1, ""), "'' is no name that code can use");
  EXPECT_TRUE(problem(1, "y").starts_with("'y' means something else already in "));
  EXPECT_TRUE(problem(2, "size").starts_with("'len' is defined outside of the project, in "));
  EXPECT_EQ(problem(3, "other"), "nothing is known of what 'nothing' stands for here");
  EXPECT_EQ(problem(4, "other"), "there is no name here");
}

// ---- completions ----

Words Completed(Program& program, size_t place = 0) {
  Words names;
  for (const Completion& one : program->Complete(program[place].file, program[place].offset))
    if (!one.name.starts_with("__")) names.push_back(one.name);
  return names;
}

bool Holds(const Words& words, const std::string& word) { return std::ranges::find(words, word) != words.end(); }

TEST(Completions, FollowTheDot) {
  Program program(
      "class A:\n  x = 1\n  def m(self): self.y = 1\n  @property\n  def p(self): pass\n  class In: pass\n"
      "class B(A):\n  def _own(self): pass\nB().$\nB().m$\n'a'.up$\n");
  EXPECT_EQ(Completed(program, 0), (Words{"x", "m", "p", "In", "y", "_own"}));
  EXPECT_EQ(Completed(program, 1), Words{"m"});
  EXPECT_EQ(Completed(program, 2), Words{"upper"});
  const auto found = program->Complete(program[0].file, program[0].offset);
  const auto kind_of = [&](Text name) {
    const auto at = std::ranges::find(found, name, &Completion::name);
    return at == found.end() ? "-" : at->kind;
  };
  EXPECT_EQ(kind_of("x"), "attribute");
  EXPECT_EQ(kind_of("m"), "method");
  EXPECT_EQ(kind_of("p"), "property");
  EXPECT_EQ(kind_of("In"), "class");
  EXPECT_EQ(kind_of("y"), "attribute");
}

TEST(Completions, OfNamesAreThoseOfTheScopesAround) {
  Program program(
      "value = 1\nclass Class:\n  valve = 1\n  def method(self, vast):\n    vary = 1\n    va$\ndef other(): vain = "
      "1\n");
  EXPECT_EQ(Completed(program), (Words{"vast", "vary", "value", "ValueError"}));
}

TEST(Completions, KnowImports) {
  Program program({
      {"main.py",
       "import pa$\nfrom pack import $\nfrom pack.a import o$\nfrom . import ma$\nimport pack.$\nfrom x import y as "
       "$\n"},
      {"pack/__init__.py", "name = 1\n"},
      {"pack/a.py", "one = 1\n_own = 2\nother = 3\n"},
      {"parts.py", ""},
  });
  EXPECT_EQ(Completed(program, 0), (Words{"pack", "parts"}));
  Words names = Completed(program, 1);
  std::ranges::sort(names);
  EXPECT_EQ(names, (Words{"a", "name"}));
  EXPECT_EQ(Completed(program, 2), (Words{"one", "other"}));
  EXPECT_EQ(Completed(program, 3), Words{"main"});
  EXPECT_EQ(Completed(program, 4), Words{"a"});
  EXPECT_EQ(Completed(program, 5), Words{});
}

TEST(Completions, OfferTheKeywordsOfACall) {
  Program program(
      "def f(first, second=1, *, third=2): pass\nf(1, $)\nf(third=1, $)\nclass A:\n  def __init__(self, size): "
      "pass\nA(si$)\n");
  const auto keywords = [&](size_t place) {
    Words names = Completed(program, place);
    std::erase_if(names, [](const std::string& name) { return !name.ends_with('='); });
    return names;
  };
  EXPECT_EQ(keywords(0), (Words{"second=", "third="}));
  EXPECT_EQ(keywords(1), (Words{"first=", "second="}));
  EXPECT_EQ(keywords(2), Words{"size="});
}

TEST(Completions, SayNothingWhereAPlaceGivesANewName) {
  for (const char* const text :
       {"def f$\n", "class C$\n", "x = 'a$'\n", "x = 1$\n", "def f(a$): pass\n", "import a as b$\n"}) {
    Program program(text);
    EXPECT_EQ(Completed(program), Words{}) << text;
  }
}

TEST(Completions, OfferStatementsOutsideOfBrackets) {
  Program program("re$\nf(re$)\ntr$\nf(la$)\n");
  EXPECT_TRUE(Holds(Completed(program, 0), "return"));
  EXPECT_FALSE(Holds(Completed(program, 1), "return"));
  EXPECT_TRUE(Holds(Completed(program, 2), "try"));
  EXPECT_TRUE(Holds(Completed(program, 3), "lambda"));
}

// ---- signatures and hovers ----

TEST(Signatures, KnowTheActiveParameter) {
  Program program(
      "def f(a: int, b=1, *rest, c, **more) -> str:\n  'Words.'\nf($)\nf(1, $)\nf(1, 2, 3, $)\nf(c=$1)\nf(d=$1)\nf(1, "
      "g(2, $3))\nf(1, (2, $3))\n"
      "class A:\n  def __init__(self, x): pass\n  def m(self, y): pass\nA($)\nA(1).m($)\nA.m(1, $)\nf(1$\n");
  const auto at = [&](size_t place) -> std::string {
    const std::vector<Signature> found = program->Signatures(program[place].file, program[place].offset);
    if (found.size() != 1) return std::to_string(found.size());
    const Signature& one = found[0];
    return one.label + (one.active < 0 ? "" : " @" + one.parameters[static_cast<size_t>(one.active)].name);
  };
  const std::string f = "f(a: int, b=1, *rest, c, **more) -> str";
  EXPECT_EQ(at(0), f + " @a");
  EXPECT_EQ(at(1), f + " @b");
  EXPECT_EQ(at(2), f + " @rest");
  EXPECT_EQ(at(3), f + " @c");
  EXPECT_EQ(at(4), f + " @more");
  EXPECT_EQ(at(5), "0");
  EXPECT_EQ(at(6), f + " @b");
  EXPECT_EQ(at(7), "A(x) @x");
  EXPECT_EQ(at(8), "m(y) @y");
  EXPECT_EQ(at(9), "m(self, y) @y");
  EXPECT_EQ(at(10), f + " @a");
  EXPECT_EQ(program->Signatures(program[0].file, program[0].offset)[0].documentation, "Words.");
}

TEST(Signatures, OfNamedTuplesAreTheirFields) {
  for (const char* fields : {"' x, y '", "'x y'", "'x,y,'", "['x', 'y']", "'''x\n  y\n'''"}) {
    Program program("from collections import namedtuple\nP = namedtuple('P', " + std::string(fields) + ")\nP($)\n");
    const auto signatures = program->Signatures(program[0].file, program[0].offset);
    ASSERT_EQ(signatures.size(), 1u) << fields;
    EXPECT_EQ(signatures[0].label, "P(x, y)") << fields;
  }
}

TEST(Signatures, AreNotThoseOfACallThatAnotherStatementLeftOpen) {
  Program program("def f(a): pass\nf(1,\nimport os\nos.path $\nf(1, $\n");
  EXPECT_TRUE(program->Signatures(program[0].file, program[0].offset).empty());
  EXPECT_EQ(program->Signatures(program[1].file, program[1].offset).size(), 1u);
}

TEST(Signatures, AreThoseOfEveryOverload) {
  Program program(
      "from typing import overload\n@overload\ndef f(x: int) -> int: ...\n@overload\ndef f(x: str, y: int) -> str: "
      "...\n"
      "def f(*a): pass\nf($)\n");
  Words labels;
  for (const Signature& one : program->Signatures(program[0].file, program[0].offset)) labels.push_back(one.label);
  EXPECT_EQ(labels, (Words{"f(x: int) -> int", "f(x: str, y: int) -> str"}));
}

TEST(Hovers, ShowDeclarationsAndDocumentation) {
  Program program(
      "def f(a, b=1):\n  '''One.\n\n    Two.\n  '''\n  return 1\n$f\nx = 1\n$x\nclass C:\n  'About C.'\n$C\n$ \n");
  const auto at = [&](size_t i) { return program->HoverAt(program[i].file, program[i].offset); };
  EXPECT_EQ(at(0).text, "def f(a, b=1) -> int");
  EXPECT_EQ(at(0).documentation, "One.\n\nTwo.");
  EXPECT_EQ(at(0).end - at(0).begin, 1u);
  EXPECT_EQ(at(1).text, "x: int");
  EXPECT_EQ(at(1).types, Words{"builtins.int"});
  EXPECT_EQ(at(2).text, "class C");
  EXPECT_EQ(at(2).documentation, "About C.");
  EXPECT_EQ(at(3).text, "");
}

TEST(Hovers, TakeWordsFromTheSourceWhereAStubHasNone) {
  Program program({
      {"a.py", "import lib\nlib.$told\nlib.$silent\n"},
      {"lib.pyi", "def told():\n  '''Of the stub.'''\ndef silent(): ...\n"},
      {"lib.py", "def told():\n  '''Of the source.'''\ndef silent():\n  '''Of the source.'''\n"},
  });
  const auto at = [&](size_t i) { return program->HoverAt(program[i].file, program[i].offset).documentation; };
  EXPECT_EQ(at(0), "Of the stub.");
  EXPECT_EQ(at(1), "Of the source.");
}

TEST(Types, AtAClosingBracketAreThoseOfWhatItCloses) {
  EXPECT_EQ(Program("class B: pass\nclass A(B$): pass\nx = (1 + 1$)\ny = str(1$)\n").AllTypes(),
            (Words{"type[a.B]", "builtins.int", "builtins.str"}));
  // Of each its own, where several end in a row.
  EXPECT_EQ(
      Program("x = ('a' + str(1)$)\ny = (1.5 * (2$)$)\nz = (1.5 + int(x\n  $)\n $)\nw = (1.5 * ((2$)$)$)\n").AllTypes(),
      (Words{"builtins.str", "builtins.int", "builtins.float", "builtins.int", "builtins.float", "builtins.int",
             "builtins.int", "builtins.float"}));
}

TEST(Types, OfFunctionsAreTheirSignatures) {
  Program program(
      "class B: pass\ndef $f(x: int, b: B) -> list[str]: ...\ndef $g(self, x, *y):\n  # type: (int, *str) -> B\n  "
      "pass\n"
      "$h = lambda x=1: x\n");
  EXPECT_EQ(program.AllTypes(),
            (Words{"def (x: int, b: a.B) -> list[str]", "def (self, x: int, *y: str) -> a.B", "def (x=1) -> int"}));
}

// ---- outlines and symbols ----

TEST(Outlines, ShowAHeadOnOneLine) {
  Program program(
      {{"a.py", "def f(\n    a,  # the first\n    b=(1,), c='x  # y',\n):\n  pass\nclass C ( D ,\n  E ): pass\n"}});
  const std::vector<OutlineItem> items = program->Outline(program.File("a.py"));
  ASSERT_EQ(items.size(), 2u);
  EXPECT_EQ(items[0].detail, "(a, b=(1,), c='x  # y')");
  EXPECT_EQ(items[1].detail, "(D , E)");
}

TEST(Outlines, AreTreesOfWhatAFileDefines) {
  Program program(
      "X = 1\n@deco\nclass A:\n  y = 2\n  def m(self, z):\n    def inner(): pass\n    local = 1\nasync def f(): pass\n"
      "if a:\n  def g(): pass\nX = 2\n");
  std::string said;
  const std::vector<OutlineItem> items = program->Outline(program.File("a.py"));
  for (const OutlineItem& item : items)
    said += item.kind + " " + item.name + (item.parent < 0 ? "" : "<" + items[static_cast<size_t>(item.parent)].name) +
            "\n";
  EXPECT_EQ(said, "variable X\nclass A\nattribute y<A\nmethod m<A\nfunction inner<m\nfunction f\nfunction g\n");
  EXPECT_EQ(program.Say(program.File("a.py"), items[1].begin), "a.py:2:1");
  EXPECT_EQ(program.Say(program.File("a.py"), items[1].name_begin), "a.py:3:7");
}

TEST(Symbols, AreRanked) {
  Program program({
      {"a.py", "total = 1\nclass Total: pass\ndef total_of(): pass\nclass Basket:\n  def total(self): pass\n"},
      {"b.py", "def subtotal(): pass\ndef two_or_ten_apples(l): pass\ndef nothing(): local_total = 1\n"},
  });
  Words said;
  for (const SymbolInfo& symbol : program->Symbols("total"))
    said.push_back(symbol.kind + " " + symbol.container + "." + symbol.name);
  EXPECT_EQ(said, (Words{"method a.Basket.total", "variable a.total", "class a.Total", "function a.total_of",
                         "function b.subtotal", "function b.two_or_ten_apples"}));
  EXPECT_EQ(program->Symbols("total", 2).size(), 2u);
  EXPECT_EQ(program->Symbols("twoten").size(), 1u);
  EXPECT_EQ(program->Symbols("zzz").size(), 0u);
  Program letters("def aZ(): pass\ndef Az(): pass\n");
  for (const Text query : {"az", "AZ", "Az", "zA"}) EXPECT_EQ(letters->Symbols(query).size(), query == "zA" ? 0u : 2u);
}

TEST(Symbols, HaveTheColumnsOfWhoAsks) {
  Program program({
      {"a.py", "\xEF\xBB\xBFxa = 1\nxb = 2\n"},
      {"b.py", "\xC3\xA4 = 1; xc = 2\nx\xC3\xA4 = 3\n'\xF0\x9F\x98\x80'; xd = 4\nif a: xe = 5\n"},
  });
  const auto columns = [&] {
    std::map<std::string, std::pair<int, int>> said;
    for (const SymbolInfo& symbol : program->Symbols("x")) {
      EXPECT_EQ(symbol.place, program->PlaceOf(symbol.file, symbol.begin)) << symbol.name;
      said[symbol.name] = {symbol.place.col, symbol.end_column};
    }
    return said;
  };
  using Columns = std::map<std::string, std::pair<int, int>>;
  EXPECT_EQ(
      columns(),
      (Columns{
          {"xa", {1, 3}}, {"xb", {1, 3}}, {"xc", {9, 11}}, {"x\xC3\xA4", {1, 4}}, {"xd", {9, 11}}, {"xe", {7, 9}}}));
  program->set_column_unit(ColumnUnit::kUtf16);
  EXPECT_EQ(
      columns(),
      (Columns{
          {"xa", {1, 3}}, {"xb", {1, 3}}, {"xc", {8, 10}}, {"x\xC3\xA4", {1, 3}}, {"xd", {7, 9}}, {"xe", {7, 9}}}));
}

TEST(Named, TakesDottedNames) {
  Program program({{"shop.py", "class Shop:\n  def total(self): self.sum = 1\ndef total(): pass\n"}});
  EXPECT_EQ(program.Say(program->Named("Shop.total")), Words{"shop.py:2:7"});
  EXPECT_EQ(program.Say(program->Named("shop.total")), Words{"shop.py:3:5"});
  EXPECT_EQ(program.Say(program->Named("shop.Shop.total")), Words{"shop.py:2:7"});
  EXPECT_EQ(program.Say(program->Named("total")), (Words{"shop.py:2:7", "shop.py:3:5"}));
  EXPECT_EQ(program.Say(program->Named("Other.total")), Words{});
}

// ---- calls and classes ----

Words SayCalls(Program& program, const std::vector<Call>& calls) {
  Words said;
  for (const Call& call : calls) {
    std::string one = call.name + ":";
    for (const Location& location : call.calls) one += " " + program.Say(location);
    said.push_back(one);
  }
  std::ranges::sort(said);
  return said;
}

TEST(Calls, AreKnownFromBothSides) {
  Program program({
      {"a.py",
       "class A:\n  def $m(self): $helper()\n  def n(self):\n    self.m()\n    return lambda: self.m()\n"
       "def helper(): pass\nA().m()\n"},
      {"b.py", "from a import A, helper\ndef $f(a: A):\n  a.m()\n  helper()\n  A()\n  def inner(): helper()\n"},
  });
  EXPECT_EQ(SayCalls(program, program->Callers(program[0].file, program[0].offset)),
            (Words{"a.A.n: a.py:4:10 a.py:5:25", "a: a.py:7:5", "b.f: b.py:3:5"}));
  EXPECT_EQ(SayCalls(program, program->Callers(program[1].file, program[1].offset)),
            (Words{"a.A.m: a.py:2:16", "b.f.inner: b.py:6:16", "b.f: b.py:4:3"}));
  EXPECT_EQ(SayCalls(program, program->Callees(program[2].file, program[2].offset)),
            (Words{"a.A.m: b.py:3:5", "a.A: b.py:5:3", "a.helper: b.py:4:3"}));
}

TEST(Classes, ThatAreBasesOfEachOtherAreKnownAsFarAsTheyGo) {
  Program program({
      {"a.py", "import b\nclass $A(b.B): pass\nA().$m\n"},
      {"b.py", "import a\nclass $B(a.A):\n  def m(self): return 1\n"},
  });
  EXPECT_EQ(program.Say(program->Supertypes(program[0].file, program[0].offset)), Words{"b.py:2:7"});
  EXPECT_EQ(program.Say(program->Definitions(program[1].file, program[1].offset)), Words{"b.py:3:7"});
}

TEST(Classes, KnowTheirBasesAndWhatDerivesFromThem) {
  Program program({
      {"a.py", "class $A:\n  def $m(self): pass\n"},
      {"b.py", "import a\nclass $B(a.A):\n  def $m(self): pass\nclass C(B): pass\nclass Other: pass\n"},
  });
  const auto up = [&](size_t i) { return program.Say(program->Supertypes(program[i].file, program[i].offset)); };
  const auto down = [&](size_t i) { return program.Say(program->Subtypes(program[i].file, program[i].offset)); };
  EXPECT_EQ(down(0), Words{"b.py:2:7"});
  EXPECT_EQ(down(1), Words{"b.py:3:7"});
  EXPECT_EQ(up(2), Words{"a.py:1:7"});
  EXPECT_EQ(down(2), Words{"b.py:4:7"});
  EXPECT_EQ(up(3), Words{"a.py:2:7"});
  Program plain("def $f(): pass\n");
  EXPECT_TRUE(plain->Supertypes(plain[0].file, plain[0].offset).empty());
  EXPECT_TRUE(plain->Subtypes(plain[0].file, plain[0].offset).empty());
}

// ---- problems ----

Words ProblemsOf(Program& program, std::string_view path = "a.py") {
  Words said;
  for (const Problem& problem : program->Problems(program.File(path)))
    said.push_back(program.Say(program.File(path), problem.begin) + " " + problem.code + ": " + problem.message);
  return said;
}

TEST(Problems, AreImportsOfNothingAndUnboundNames) {
  Program program({
      {"a.py",
       "import nowhere\nimport b.missing\nfrom b import there, absent\nfrom nowhere.deep import x\n"
       "try:\n  import fast\nexcept ImportError:\n  fast = None\nprint(there, unheard, __name__, fast)\n"
       "def f():\n  return later\nlater = 1\nclass C:\n  def m(self): return __class__\ndel undone\n"},
      {"b.py", "there = 1\n"},
  });
  EXPECT_EQ(ProblemsOf(program), (Words{"a.py:1:8 unresolved-import: no module named 'nowhere'",
                                        "a.py:2:10 unresolved-import: no module named 'missing'",
                                        "a.py:3:22 unresolved-import: nothing is named 'absent' there",
                                        "a.py:4:6 unresolved-import: no module named 'nowhere'",
                                        "a.py:9:14 unbound-name: nothing binds the name 'unheard'"}));
}

TEST(Problems, AreNoneBehindStarsOfAnythingAndWhatIsNeverRun) {
  Program star("from nowhere import *\nanything\n");
  EXPECT_EQ(ProblemsOf(star), Words{"a.py:1:6 unresolved-import: no module named 'nowhere'"});
  Program old("import sys\nif sys.version_info < (3,):\n  import urllib2\n");
  EXPECT_EQ(ProblemsOf(old), Words{});
}

TEST(Problems, OfImportsThatAreBrokenOffAreThoseOfTheirWholeParts) {
  const std::pair<const char*, Words> cases[] = {
      {"import\n", {}},
      {"import c.\n", {"a.py:1:8 unresolved-import: no module named 'c'"}},
      {"from c import\n", {"a.py:1:6 unresolved-import: no module named 'c'"}},
      {"from b import (x,\n", {"a.py:1:16 unresolved-import: nothing is named 'x' there"}},
      {"from b import x y\n", {"a.py:1:15 unresolved-import: nothing is named 'x' there"}},
      {"import (c)\n", {}},
  };
  for (const auto& [source, expected] : cases) {
    Program program({{"a.py", source}, {"b.py", "there = 1\n"}});
    EXPECT_EQ(ProblemsOf(program), expected) << source;
  }
}

// ---- buffers ----

TEST(Buffers, StandForTheirFiles) {
  Program program({{"a.py", "from b import $f\n"}, {"b.py", "def f(): return 1\n"}});
  EXPECT_EQ(program.Types(0), "def () -> int");
  program.Open("b.py", "\ndef f(): return 'a'\n");
  EXPECT_EQ(program.Types(0), "def () -> str");
  EXPECT_EQ(program.Definitions(0), Words{"b.py:2:5"});
  program->Change(program.File("b.py"), 5, 6, "g");
  EXPECT_EQ(program.Definitions(0), Words{"a.py:1:15"});  // no more than what binds the name
  EXPECT_EQ(ProblemsOf(program), Words{"a.py:1:15 unresolved-import: nothing is named 'f' there"});
  program->Close(program.File("b.py"));
  EXPECT_EQ(program.Types(0), "def () -> int");
  EXPECT_EQ(ProblemsOf(program), Words{});
}

TEST(Buffers, ChangeWhatIsFoundByName) {
  Program program({{"main.py", "def f(thing):\n  thing.$speed\n"}, {"a.py", "class A:\n  def speed(self): pass\n"}});
  EXPECT_EQ(program.Definitions(), Words{"a.py:2:7 likely"});
  program.Open("a.py", "class A:\n  def slow(self): pass\n");
  EXPECT_EQ(program.Definitions(), Words{});
  const FileId a = program.File("a.py");
  program->Change(a, 15, 19, "speed = 1 #");
  program->Change(a, 11, 14, "   ");
  EXPECT_EQ(program.Definitions(), Words{"a.py:2:7 likely"});
  EXPECT_EQ(program->Symbols("speed").size(), 1u);
  program->Change(a, 15, 16, "S");
  EXPECT_EQ(program.Definitions(), Words{});
  EXPECT_EQ(program->Symbols("Speed").at(0).name, "Speed");
  program->Close(a);
  EXPECT_EQ(program.Definitions(), Words{"a.py:2:7 likely"});
  EXPECT_EQ(program->Symbols("speed").at(0).kind, "method");
}

TEST(Buffers, NeedNoFile) {
  Program program({{"a.py", "from fresh import $f\n"}});
  EXPECT_EQ(program.Definitions(0), Words{"a.py:1:19"});
  program.Open("fresh.py", "def f(): pass\n");
  EXPECT_EQ(program.Definitions(0), Words{"fresh.py:1:5"});
  EXPECT_EQ(program.References(0), (Words{"a.py:1:19", "fresh.py:1:5"}));
  program->Close(program.File("fresh.py"));
  EXPECT_EQ(program.Definitions(0), Words{"a.py:1:19"});
}

// ---- any place of any file ----

TEST(Questions, SayThatAnyOfTheirPartsMetABound) {
  static constexpr int kFunctions = 48;
  std::string text = "class A:\n  def $m(self): pass\n";
  for (int i = 0; i < kFunctions; ++i) {
    text += "def f" + std::to_string(i) + "(x, y, z, u, v, w):\n  x.m()\n";
    for (int j = 0; j < kFunctions; ++j) text += "  f" + std::to_string(j) + "(y, z, u, v, w, x)\n";
  }
  Program program(text + "A().$m()\n");
  EXPECT_EQ(program->References(program[0].file, program[0].offset).size(), kFunctions + 2);
  EXPECT_TRUE(program->was_bounded());
  EXPECT_EQ(program->Definitions(program[1].file, program[1].offset).size(), 1u);
  EXPECT_FALSE(program->was_bounded());
}

TEST(Questions, LetTheLastOfGuessesPayForWhatIsSure) {
  std::string text = "class A:\n  def m(self): pass\n";
  std::string heavy = "def heavy():\n";
  for (int i = 0; i < 1200; ++i) {
    const std::string name = "f" + std::to_string(i);
    text += "def " + name + "(): return A()\n";
    heavy += "  if unknown(" + std::to_string(i) + "): return " + name + "()\n";
  }
  text += heavy + "def last(x): $x\ndef second(x): last(x)\ndef third(x): second(x)\nthird(heavy())\n$heavy()\n";
  Program program(text);
  EXPECT_EQ(program.Types(0), "");
  EXPECT_TRUE(program->was_bounded());
  EXPECT_EQ(program.Types(1), "def () -> a.A | None");
  EXPECT_FALSE(program->was_bounded());
}

TEST(Questions, LetNoGuessPayForFilesInWhichWhatIsSureWasFound) {
  const std::string text = "class A: pass\ndef f(x):\n  y = made() or x\n  $y\nf(A())\n";
  const std::string too_long = "# " + std::string(size_t{4} << 20, '-') + "\n";
  Program program({{"a.py", "from b import made\n" + text}, {"b.py", too_long + "def made() -> int: ...\n"}});
  EXPECT_EQ(program.Types(0), "a.A | builtins.int");
  EXPECT_FALSE(program->was_bounded());
}

TEST(Questions, SayThatMoreFilesDefineAMemberThanTheyLookAt) {
  testing::TemporaryFolder folder = {{"a.py", "def f(x): x.speed; x.weight\n"}};
  for (int i = 0; i < 401; ++i) {
    const std::string member = i < 400 ? "  def weight(self): pass\n" : "";
    folder.Write("m" + std::to_string(i) + ".py", "class C:\n  def speed(self): pass\n" + member);
  }
  Workspace::Settings settings;
  settings.roots = {folder.path()};
  Workspace workspace(std::move(settings));
  const FileId file = workspace.FileOf(folder / "a.py");
  EXPECT_EQ(workspace.Definitions(file, workspace.OffsetOf(file, 1, 13)).size(), 400u);
  EXPECT_TRUE(workspace.was_bounded());
  EXPECT_EQ(workspace.Definitions(file, workspace.OffsetOf(file, 1, 22)).size(), 400u);
  EXPECT_FALSE(workspace.was_bounded());
}

TEST(Questions, AreAnsweredWithoutALibrary) {
  const testing::TemporaryFolder folder = {
      {"a.py", "class A:\n  x = None\n  def f(self): self.y = A(); return self.y.x or 'a'\nA().y.f().z\n"}};
  Workspace::Settings settings;
  settings.roots = {folder.path()};
  settings.version = Version::Of(3, 12);
  Workspace workspace(std::move(settings));
  const FileId file = workspace.FileOf(folder / "a.py");
  EXPECT_EQ(workspace.Types(file, workspace.OffsetOf(file, 4, 5)), Words{"a.A"});
  EXPECT_EQ(workspace.Definitions(file, workspace.OffsetOf(file, 4, 7)).size(), 1u);
  EXPECT_EQ(workspace.Types(file, workspace.OffsetOf(file, 4, 11)), Words{});
}

TEST(Questions, AreAnsweredWhereTheLibraryLacksAClass) {
  const testing::TemporaryFolder folder = {
      {"a.py",
       "def f(**options):\n  return options['a'].x\nf(a=1)\nclass A:\n  @property\n  def p(self): return 1\nA().p\n"}};
  Workspace::Settings settings;
  settings.roots = {folder.path()};
  settings.version = Version::Of(3, 12);
  Workspace workspace(std::move(settings));
  const FileId file = workspace.FileOf(folder / "a.py");
  EXPECT_EQ(workspace.Types(file, workspace.OffsetOf(file, 2, 10)), Words{});
  EXPECT_EQ(workspace.Types(file, workspace.OffsetOf(file, 2, 23)), Words{});
  EXPECT_EQ(workspace.Definitions(file, workspace.OffsetOf(file, 7, 5)).size(), 1u);
}

TEST(Questions, AreAnsweredAtEveryPlace) {
  const std::string_view text =
      "from a import *\nimport a.a as b\nclass A(A, B[int]):\n  x: 'A' = f(\n  def m(self, *a, **k): return self.\n"
      "with x as y, : z = [i for i in\nmatch a:\n  case {'k': v, **r}: f'{x!r:{w}}'\nlambda: (yield)\n@\n\xC3\xA4 = "
      "\xFF\nclass:\n  def m(self, a=1): return a\n  class D: pass\ndef (q):\n  from os import *\n  def g(): return "
      "q\n";
  Program program(text);
  const FileId file = program.File("a.py");
  for (const FileId at : {file, program.File("nothing.py")}) {
    for (uint32_t offset = 0; offset < text.size() + 3; ++offset) {
      program->Definitions(at, offset);
      program->TypeDefinitions(at, offset);
      program->References(at, offset);
      program->Types(at, offset);
      program->HoverAt(at, offset);
      program->Signatures(at, offset);
      program->Complete(at, offset);
      program->Callers(at, offset);
      program->Callees(at, offset);
      program->Supertypes(at, offset);
      program->Subtypes(at, offset);
      EXPECT_NE(program->RenameTo(at, offset, "new name").problem, "") << offset;
    }
    program->Problems(at);
    program->Outline(at);
  }
}

}  // namespace
}  // namespace quillet
