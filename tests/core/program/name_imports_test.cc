// What texts import under a name, and where that cannot be told.
#include "program/name_imports.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace quillet {
namespace {

using Words = std::vector<std::string>;

// "..module:name" of each import of `total`; "?" where more may be meant.
Words Imports(Text source) {
  const auto found = ImportsOfName(source, "total");
  if (!found) return {"?"};
  Words said;
  for (const NameImport& import : *found)
    said.push_back(std::string(static_cast<size_t>(import.level), '.') + import.module + ":" +
                   (import.name.empty() ? "*" : import.name));
  return said;
}

TEST(NameImports, AreReadWhereverTheyStand) {
  EXPECT_EQ(Imports("from shop import total\ntotal()\n"), Words{"shop:total"});
  EXPECT_EQ(Imports("from shop.cart import a, total as t\n"), Words{"shop.cart:total"});
  EXPECT_EQ(Imports("from . import total"), Words{".:total"});
  EXPECT_EQ(Imports("from .. cart import sum as total"), Words{"..cart:sum"});
  EXPECT_EQ(Imports("from ...a . b import(x, total)"), Words{"...a.b:total"});
  EXPECT_EQ(Imports("from shop import (a,  # total\n    total,\n    b)\ntotal\n"), Words{"shop:total"});
  EXPECT_EQ(Imports("from shop \\\n  import a, \\\r\n  total; x = total\n"), Words{"shop:total"});
  EXPECT_EQ(Imports("if x: from shop import total # and more\n"), Words{"shop:total"});
  EXPECT_EQ(Imports("from a import *\ntotal()\nfrom b import total\n"), (Words{"a:*", "b:total"}));
  EXPECT_EQ(Imports("'''\nfrom shop import total\n'''\n"), Words{"shop:total"});
  EXPECT_EQ(Imports("from shop import other, subtotal\ntotal = 1\nf(total=2)\nraise total from e\nyield from total\n"),
            Words{});
  EXPECT_EQ(Imports("import total\nimport total as t\n"), Words{});
  EXPECT_EQ(Imports("from .total import x\nfrom shop.total import y\ntotal\n"), Words{});
  EXPECT_EQ(Imports(""), Words{});
}

TEST(NameImports, AreNotAllWhereTheNameStandsBehindADot) {
  for (const char* source : {
           "shop.total()",
           "shop . total",
           "import shop.total",
           "(shop.\n  total)",
           "(shop.  # why\n  total)",
           "(shop.  # why\n\n  # because\n  total)",
           "shop.\\\n  total",
           "'shop.total'",
           "from .total import x\nshop.total",
       })
    EXPECT_EQ(Imports(source), Words{"?"}) << source;
  EXPECT_EQ(Imports("x = 1.  # one\ny = 2\n\n# more\ntotal = 3\n"), Words{});
  EXPECT_EQ(Imports("(shop\n  .x,\n  total)\n"), Words{});
}

TEST(NameImports, AreNotAllWhereOneIsBroken) {
  for (const char* source : {
           "from shop. import total",
           "from import total",
           "from shop import (a, total",
           "from shop import a.total",
           "from shop import a = total",
       })
    EXPECT_EQ(Imports(source), Words{"?"}) << source;
}

}  // namespace
}  // namespace quillet
