// What texts say of the members of classes.
#include "program/member_texts.h"

#include <gtest/gtest.h>

namespace quillet {
namespace {

TEST(MemberTexts, DefineInClassesAndOfSelf) {
  for (const Text source : {"class A:\n  total = 1\n", "class A:\n  def total(self): pass\n",
                            "class A:\n  def f(self):\n    self.total = 1\n", "class A:\n  total: int\n"}) {
    EXPECT_TRUE(MayDefineMember(source, "total")) << source;
    EXPECT_TRUE(MayGiveMember(source, "total")) << source;
  }
}

TEST(MemberTexts, DoNotDefineByOtherUses) {
  for (const Text source : {"def total(): pass\n", "total = 1\n", "def f():\n  total = 1\n",
                            "class A:\n  def f(self):\n    total = 1\n", "class A:\n  '''\n  total = 1\n  '''\n",
                            "class A:\n  x = f(a.total(1))  # total = 1\n", "print(a.total())\n"}) {
    EXPECT_FALSE(MayDefineMember(source, "total")) << source;
    EXPECT_FALSE(MayGiveMember(source, "total")) << source;
  }
}

TEST(MemberTexts, GiveToAnything) {
  for (const Text source : {"obj.total = 1\n", "obj.total += 1\n", "obj . total: int = 1\n", "obj.total, x = f()\n",
                            "(x, obj.total) = f()\n", "for obj.total in y: pass\n", "with f() as obj.total: pass\n",
                            "class A:\n  __slots__ = 'a', 'total'\n"})
    EXPECT_TRUE(MayGiveMember(source, "total")) << source;
  for (const Text source :
       {"if obj.total: pass\n", "x = f(obj.total)\n", "x = obj.total\n", "x = obj.total if y else z\n",
        "return obj.total  # = 1\n", "x = {obj.total}\n", "x = 'total'\n", "if obj.total == 1: pass\n"})
    EXPECT_FALSE(MayGiveMember(source, "total")) << source;
}

}  // namespace
}  // namespace quillet
