// What lines say that a source may define: nothing that it defines is missing, and little is there that it does not.
#include "program/possible_symbols.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <set>
#include <string>

#include "names/binder.h"

namespace quillet {
namespace {

using Names = std::set<std::string>;

// "+name" for classes and functions, "name" for variables; "?" where lines do not tell.
Names Possible(std::string source, Version version = Version::Of(3, 12)) {
  PossibleSymbols lines;
  const std::string before = source;
  const bool is_told = lines.Read(source, version);
  EXPECT_EQ(source, before);
  if (!is_told) return {"?"};
  Names names;
  for (const PossibleSymbols::Symbol& symbol : lines.symbols())
    names.insert((symbol.is_variable ? "" : "+") + std::string(symbol.name));
  return names;
}

// Those that the binder finds.
Names Defined(const std::string& source, Version version = Version::Of(3, 12)) {
  NameBinder binder(version);
  const Bindings& bindings = binder.Bind(source);
  Names names;
  for (const Occurrence& occurrence : bindings.occurrences) {
    const NameScopeKind around = bindings.scopes[bindings.ScopeOf(occurrence)].kind;
    const bool is_definition = occurrence.kind == NameKind::kClass || occurrence.kind == NameKind::kFunction;
    const bool is_seen = around == NameScopeKind::kModule || around == NameScopeKind::kClass;
    if (!occurrence.has_symbol || !(is_definition || (occurrence.kind == NameKind::kVariable && is_seen))) continue;
    names.insert((is_definition ? "+" : "") + std::string(bindings.TextOf(occurrence)));
  }
  return names;
}

Names Missing(const std::string& source, Version version = Version::Of(3, 12)) {
  const Names possible = Possible(source, version);
  Names missing;
  if (!possible.contains("?"))
    std::ranges::set_difference(Defined(source, version), possible, std::inserter(missing, missing.end()));
  return missing;
}

constexpr const char* kSource =
    "'''text\ndef not_this(): pass\n'''\n"
    "import os, a.b as c\nfrom d import (e,\n  f as g)\n"
    "x = y.z = w[i] = 1; v: int = 2\n"
    "(p, *q), [r, s] = t = f(u=1)\n"
    "n += 1; m <<= k <= l\n"
    "if x == y: a1 = 1\nelse: a2 = 'def b1(): pass'\n"
    "for a3, (a4, a5) in a6: a7 = [b2 for b2 in a3]\n"
    "with open(b3) as a8, b4 as (a9, c1), b5: c2 = 1\n"
    "with (b6 as c3, b7 as [c4, c5]):\n  c6 = 1\n"
    "try:\n  pass\nexcept (E, F) as c7: pass\n"
    "while (c8 := next()): print(c9 := 1, f'{d1:=10} {(d2 := 3)}')\n"
    "async def g1(b, c=(d3 := 1)):\n  local = 1\n  class G2:\n    d4 = 1\n    def d5(self): self.no = 1\n  async with "
    "x as y: pass\n"
    "def g3(\n  a=1,\n  b=[\n]\n):\n  other = 2\n"
    "@decorator(d6 := 1)\nclass G4(Base, metaclass=Meta): d7 = 1; d8 = 2\n"
    "class G5(\n    Base,\n):\n  d9: int\n  e1 = lambda q: q\n\n# e\n  if x:\n    e2 = \\\n      e3 = 1\n  def "
    "e4(self): return 1\n  e5 = {'k': v, e6: 1}\n"
    "match x:\n  case Point(x=e7, y=0) | [e8, *e9] | {'k': f1, **f2}: f3 = 1\n  case (1 as f4) if f5: pass\n  case [1 "
    "as i1, i2]: pass\n"
    "case = match = type = 1\n"
    "type F6 = int\n"
    "x[0], f7 = 'a' 'b', rb'''\nf8 = 1\n'''; f9 = 1\n"
    "def\\\n  h1(): pass\n"
    "if x:\n\tdef h2():\n\t  h3 = 1\n        h4 = 1\n"
    "h5 = (1 +\n2)\nh6 = f'{x!r:>{h7}}' \"it's\" '\\'' \"\\\n\"\nh8 = 1";

TEST(PossibleSymbols, HoldAllThatIsDefined) {
  EXPECT_FALSE(Possible(kSource).contains("?"));
  EXPECT_EQ(Missing(kSource), Names());
  EXPECT_GT(Defined(kSource).size(), 60u);
  EXPECT_EQ(Missing("\xEF\xBB\xBFx = 1\r\ndef f():\r\n  y = 1\r\nclass A:\r  z = 1\r"), Names());
  EXPECT_EQ(Missing("x = t'{a}'\ny = t'{'b'}'; z = 1\n", Version::Of(3, 14)), Names());
  EXPECT_EQ(Missing("x = f'{'a'}'; y = 1\n\"\"\"\nz = 1\n\"\"\"\n"), Names());
  EXPECT_EQ(Missing("x = f'{'a'}'; y = 1\n\"\"\"\nz = 1\n\"\"\"\n", Version::Of(3, 11)), Names());
}

TEST(PossibleSymbols, HoldLittleElse) {
  EXPECT_EQ(Possible("from a import Base, x\nclass A(Base, key=Meta):\n  y = Base\n  def f(self, z=1):\n    w = y\n"),
            (Names{"+A", "+f", "y"}));
  EXPECT_EQ(Possible("def f(\n  a,\n  b=1,\n):\n  c = 1\n  '''\nd = 1\n'''\n  e = 1\ng(h, i=1)\nj(k).l = m = n\n"),
            (Names{"+f", "m"}));
  EXPECT_EQ(Possible("__all__ = ['a', 'b']\nd = {e: f, 'g': h}\ni: J = k\nassert l == m, n\ndel o\n"),
            (Names{"__all__", "d", "i"}));
}

TEST(PossibleSymbols, SayWhatMayBeAMember) {
  const auto members = [](std::string source) {
    PossibleSymbols lines;
    EXPECT_TRUE(lines.Read(source, Version::Of(3, 12)));
    Names names;
    for (const PossibleSymbols::Symbol& symbol : lines.symbols())
      if (symbol.may_be_member) names.insert(std::string(symbol.name));
    return names;
  };
  EXPECT_EQ(members("x = 1\ndef f(): pass\nclass A: y = 1; z = 2\nu: int\n"), (Names{"y", "z"}));
  EXPECT_EQ(members("class A:\n  x = 1\n  def f(self, y):\n    z = 1\n  class B: u, v = 1, 2\nw = 1\n"),
            (Names{"x", "f", "B", "u", "v"}));
  NameBinder binder(Version::Of(3, 12));
  const Bindings& bindings = binder.Bind(kSource);
  const Names all = members(kSource);
  size_t count = 0;
  for (const Occurrence& occurrence : bindings.occurrences) {
    if (!occurrence.binds() || bindings.scopes[bindings.ScopeOf(occurrence)].kind != NameScopeKind::kClass) continue;
    EXPECT_TRUE(all.contains(std::string(bindings.TextOf(occurrence)))) << bindings.TextOf(occurrence);
    ++count;
  }
  EXPECT_GT(count, 8u);
}

TEST(PossibleSymbols, AreNotToldWhereTextIsOdd) {
  EXPECT_EQ(Possible("x = 1\n", Version::Of(2, 7)), Names{"?"});
  EXPECT_EQ(Possible("'''\nx = 1\n"), Names{"?"});
  EXPECT_EQ(Possible("x = 'a\ny = 1\n"), Names{"?"});
  EXPECT_EQ(Possible("gr\xC3\xB6\xC3\x9F"
                     "e = 1\n"),
            Names{"?"});
  EXPECT_EQ(Possible("def gr\xC3\xB6\xC3\x9F"
                     "e(): pass\n"),
            Names{"?"});
  for (const char* broken : {"x = (1,\ny = 2\n", "x = (1,\ndef f(): pass\n", "x = 1)\n", ")\nx = 1\n", "for x = 1\n",
                             "if x\n", "x = $\n", "class A\n  x = 1\n"})
    EXPECT_EQ(Possible(broken), Names{"?"}) << broken;
  EXPECT_EQ(Possible("x = '\xC3\xB6'  # \xC3\xB6\n"), Names{"x"});
  EXPECT_EQ(Possible(""), Names());
}

TEST(PossibleSymbols, HoldNearlyAllOfBrokenSources) {
  std::mt19937 random(7);
  const std::string source = kSource;
  size_t told = 0, missing = 0;
  for (int i = 0; i < 4000; ++i) {
    std::string broken = source;
    for (int k = 0; k < 1 + i % 3; ++k) {
      const size_t at = random() % broken.size();
      if (random() % 2 == 0) {
        broken.erase(at, 1 + random() % 4);
      } else {
        broken.insert(at, 1, "()[]{}:;=.,\n \t'\"\\#abdef"[random() % 23]);
      }
    }
    told += Possible(broken).contains("?") ? 0 : 1;
    missing += Missing(broken).size();
  }
  EXPECT_GT(told, 1000u);
  // One in 400 names: those of the very statement that is broken.
  EXPECT_LT(missing, told * Defined(source).size() / 400);
}

}  // namespace
}  // namespace quillet
