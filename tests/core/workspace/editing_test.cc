// What editors ask about a file besides its meaning: folds, selections, colours, hints, and columns in their units.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/core/support/program.h"
#include "workspace/questions.h"

namespace quillet {
namespace {

using testing::Program;
using Words = std::vector<std::string>;

Words FoldsOf(const char* text) {
  Program program(text);
  Words words;
  for (const Fold& fold : program->Folds(program.File("a.py"))) {
    std::string word = std::to_string(fold.first_line) + "-" + std::to_string(fold.last_line);
    if (!fold.kind.empty()) word += " " + std::string(fold.kind);
    words.push_back(std::move(word));
  }
  return words;
}

TEST(Folds, AreBlocksBracketsStringsCommentsAndImports) {
  EXPECT_EQ(FoldsOf("import a\nfrom b import (\n  c,\n)\n\nx = 1\nimport d\n"), (Words{"1-4 imports"}));
  EXPECT_EQ(FoldsOf("@d\ndef f(\n  a,\n):\n  '''\n  Text\n  '''\n  if a:\n    pass\n  else:\n    pass\n\n\n# x\n"),
            (Words{"2-11", "5-7 comment", "8-9", "10-11"}));
  EXPECT_EQ(FoldsOf("x = {\n  'a': [\n    1,\n  ],\n}\ny = f(1,\n  2)\nz = (\n)\n"), (Words{"1-4", "2-3"}));
  EXPECT_EQ(FoldsOf("# region One\n# more\nx = '''\n# text\n# text\n'''\n# endregion\n"), (Words{"1-7 region", "3-6"}));
  EXPECT_EQ(FoldsOf(""), Words());
  EXPECT_EQ(FoldsOf("def f(:\n  x = (\n  1\n"), (Words{"1-3"}));
}

TEST(Selections, GrowFromANameToTheFile) {
  Program program("x = 1\nclass A:\n  @d\n  def m(self):\n    return f(a.$b, 1)\n");
  const std::string text(program->SourceOf(program[0].file));
  Words words;
  for (const Span& span : program->Selections(program[0].file, program[0].offset))
    words.push_back(text.substr(span.begin, span.end - span.begin));
  ASSERT_GE(words.size(), 7u);
  EXPECT_EQ(Words(words.begin(), words.begin() + 4), (Words{"b", "a.b", "f(a.b, 1)", "return f(a.b, 1)"}));
  EXPECT_EQ(words.back(), text);
  for (size_t i = 1; i < words.size(); ++i) {
    EXPECT_GT(words[i].size(), words[i - 1].size());
    EXPECT_NE(words[i].find(words[i - 1]), std::string::npos);
  }
}

std::string KindsOf(Program& program) {
  static const char kLetters[] = "NCETFMPVAXD";
  std::string kinds;
  for (const ColouredName& name : program->Colours(program.File("a.py")))
    kinds += kLetters[static_cast<size_t>(name.kind)];
  return kinds;
}

TEST(Colours, AreThoseOfWhatIsNamed) {
  Program program({
      {"a.py",
       "import pack.b as q\nfrom pack.b import K, g, v\nclass C(K):\n  x = 1\n  def m(self, p): return self.x + p\n"
       "@g\ndef f(a): return len(a) + q.g() + q.v + a.z() + v\n"},
      {"pack/__init__.py", ""},
      {"pack/b.py", "class K: pass\ndef g(): pass\nv = 1\n"},
  });
  // import pack.b as q; from pack.b import K, g, v; class C(K); x; m self p self x p; @g; f a; len a q g q v a z v
  EXPECT_EQ(KindsOf(program),
            "NNN"
            "NNCFV"
            "CC"
            "P"
            "MAAAPA"
            "D"
            "FA"
            "FANFNVAMV");
  const std::vector<ColouredName> all = program->Colours(program.File("a.py"));
  const std::vector<ColouredName> part = program->Colours(program.File("a.py"), all[3].begin, all[6].begin);
  ASSERT_EQ(part.size(), 3u);
  EXPECT_EQ(part[0].begin, all[3].begin);
  EXPECT_EQ(part[2].kind, all[5].kind);
  EXPECT_EQ(all[8].modifiers, kTokenDeclaration) << "class C";
}

TEST(Colours, AreThereForBrokenText) {
  Program program("def (x:\n  y.\nclass\nimport \nfrom . import\n'''\n");
  EXPECT_EQ(program->Colours(program.File("a.py"), 5, 3).size(), 0u);
  EXPECT_LE(program->Colours(program.File("a.py")).size(), 3u);
}

TEST(Hints, SayWhatIsNotWrittenAndNotPlain) {
  Program program(
      "class K:\n  def __init__(self, size, _x=0): pass\n  def m(self, count, *rest): return 1.5\n"
      "k = K(3)\nn = 1\nr = k.m(2, 4)\nalias = K\ndef f(a, /, big):\n  return k\nf(1, 2)\nf(1, big=2)\nt: int = "
      "k.m(n)\n");
  Words words;
  for (const InlineHint& hint : program->Hints(program.File("a.py")))
    words.push_back(program.Say(program.File("a.py"), hint.offset) + " " + hint.text);
  EXPECT_EQ(words, (Words{"a.py:3:28  -> float", "a.py:4:7 size=", "a.py:6:2 : float",
                          "a.py:6:9 count=", "a.py:8:17  -> K", "a.py:10:6 big="}));
  EXPECT_TRUE(program->Hints(program.File("a.py"), 0, 1).empty());
}

TEST(Hints, AreThoseOfTheTextOfNow) {
  std::string calls = "def f(a):\n  b = a\n  return b\n";
  for (int i = 0; i < 200; ++i) calls += "f(x" + std::to_string(i) + ")\n";
  Program program("");
  const FileId file = program.File("a.py");
  program->Open(file, calls);
  program->Hints(file);
  // What was called there is no more.
  program->Change(file, 30, static_cast<uint32_t>(calls.size()), "\nf(1)\n");
  const std::vector<InlineHint> hints = program->Hints(file);
  ASSERT_EQ(hints.size(), 2u);
  EXPECT_EQ(hints[0].text, " -> int");
}

TEST(Implementations, AreAllBelow) {
  Program program({
      {"a.py", "class $A:\n  def $m(self): pass\ndef $f(): pass\n"},
      {"b.py", "from a import A\nclass B(A): pass\n"},
      {"c.py", "from b import B\nclass C(B):\n  def m(self): pass\n"},
  });
  const auto implementations = [&](size_t i) {
    return program.Say(program->Implementations(program[i].file, program[i].offset));
  };
  EXPECT_EQ(implementations(0), (Words{"b.py:2:7", "c.py:2:7"}));
  EXPECT_EQ(implementations(1), Words{"c.py:3:7"});
  EXPECT_EQ(implementations(2), Words{"a.py:3:5"});
}

TEST(Declarations, LieInStubs) {
  Program program(
      {{"a.py", "import b\nb.$f()\nx = 1\n$x\n"}, {"b.py", "def f(): pass\n"}, {"b.pyi", "def f(): ...\n"}});
  const auto declarations = [&](size_t i) {
    return program.Say(program->Declarations(program[i].file, program[i].offset));
  };
  EXPECT_EQ(declarations(0), Words{"b.pyi:1:5"});
  EXPECT_EQ(declarations(1), Words{"a.py:3:1"});
}

TEST(Completions, AreDescribed) {
  Program program({
      {"a.py", "from b import $\nclass C:\n  def m(self, x: int) -> str:\n    'Says.'\n    loc = 1\n    lo$\nC().$\n"},
      {"b.py", "def g(y):\n  'Gets.'\n  return 1\n"},
  });
  const auto described = [&](size_t i, Text name) {
    const Hover hover = program->DescribeCompletion(program[i].file, program[i].offset, name);
    return hover.text + "|" + hover.documentation;
  };
  EXPECT_EQ(described(0, "g"), "def g(y) -> int|Gets.");
  EXPECT_EQ(described(1, "loc"), "loc: int|");
  EXPECT_EQ(described(2, "m"), "def m(x: int) -> str|Says.");
  EXPECT_EQ(described(2, "nothing"), "|");
}

TEST(Completions, AreDescribedBehindBlanks) {
  Program program({
      {"a.py", "$  $\nfrom b import \t $\nimport b\nb. \t$\n(b\n . $)\nx = b.  g$\n"},
      {"b.py", "def g(): return 1\n"},
  });
  Words described;
  for (const Program::Place& place : program.places())
    described.push_back(program->DescribeCompletion(place.file, place.offset, "g").text);
  EXPECT_EQ(described, (Words{"", "", "def g() -> int", "def g() -> int", "def g() -> int", "def g() -> int"}));
}

TEST(Places, CountWhatIsAskedFor) {
  Program program("a = 'ä€😀'; $b\r\tc = '😀'; $d\r\n");
  const auto places = [&] {
    std::vector<int> found;
    for (const Program::Place& place : program.places()) {
      const Position at = program->PlaceOf(place.file, place.offset);
      EXPECT_EQ(program->OffsetOf(place.file, at.line, at.col), place.offset);
      found.insert(found.end(), {at.line, at.col});
    }
    return found;
  };
  EXPECT_EQ(places(), (std::vector<int>{1, 18, 2, 14}));
  program->set_column_unit(ColumnUnit::kUtf16);
  EXPECT_EQ(places(), (std::vector<int>{1, 13, 2, 12}));
  program->set_column_unit(ColumnUnit::kUtf32);
  EXPECT_EQ(places(), (std::vector<int>{1, 12, 2, 11}));
  const FileId file = program[0].file;
  EXPECT_EQ(program->OffsetOf(file, 1, 1000), 18u) << "the end of the line is in front of what ends it";
  EXPECT_EQ(program->OffsetOf(file, 99, 1), program->SourceOf(file).size());
}

TEST(Places, CountTheMarkOfABuffer) {
  Program program("\xEF\xBB\xBFname = 1\n");
  const FileId file = program.File("a.py");
  program->set_column_unit(ColumnUnit::kUtf16);
  EXPECT_EQ(program->PlaceOf(file, 3).col, 1);
  program.Open("a.py", "\xEF\xBB\xBFname = 1\n");
  EXPECT_EQ(program->PlaceOf(file, 3).col, 2);
  EXPECT_EQ(program->OffsetOf(file, 1, 2), 3u);
}

}  // namespace
}  // namespace quillet
