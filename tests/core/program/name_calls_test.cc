// What texts say of the calls of a name.
#include "program/name_calls.h"

#include <gtest/gtest.h>

#include <string>

namespace quillet {
namespace {

NameUse Use(const std::string& source) { return UseOfName(source, "total"); }

TEST(NameCalls, AreSeenInCode) {
  for (const Text source : {"total(1)", "a.total (1)", "x = [total\n(1)]", "(total)(1)", "total \\\n (1)",
                            "(total  # the sum\n(1))", "x = '(' + total('')", "'''a\n'b' '''; total()"})
    EXPECT_EQ(Use(std::string(source)), NameUse::kMayBeCalled) << source;
}

TEST(NameCalls, OfDecoratorsHaveNoBracket) {
  EXPECT_EQ(Use("class A:\n  @total\n  def f(self): pass\n"), NameUse::kMayBeCalled);
  EXPECT_EQ(Use("@shop.total\r\ndef f(): pass\n"), NameUse::kMayBeCalled);
}

TEST(NameCalls, AreNoneWhereItIsDefinedOrRead) {
  for (const Text source : {"def total(self): pass", "class total(A): pass", "from a import total", "x = total + 1",
                            "a.total = 3", "f(total=1)", "subtotal(1)\ntotal", "total", "\"\\\"\"; total"})
    EXPECT_EQ(Use(std::string(source)), NameUse::kMentioned) << source;
}

TEST(NameCalls, AreNoneInCommentsAndStrings) {
  for (const Text source : {"", "# total(1)", "x = 'total(1)'", "'''\n>>> total(1)\n'''", "r'\\' + total(1)'",
                            "\"it's total(1)\"", "b\"\"\"a \\\"\"\" total(1) \"\"\"", "x = 1  # it's total(1)\n"})
    EXPECT_EQ(Use(std::string(source)), NameUse::kNone) << source;
  // The same in front of enough that bytes are looked at sixteen at a time.
  EXPECT_EQ(Use("'''" + std::string(100, ' ') + " total(1) '''" + std::string(100, '\n')), NameUse::kNone);
  EXPECT_EQ(Use("'''" + std::string(100, ' ') + "'''; total(1)" + std::string(100, '\n')), NameUse::kMayBeCalled);
}

TEST(NameCalls, MayBeInFieldsAndBehindWhatDoesNotEnd) {
  EXPECT_EQ(Use("f'{total(1)}'"), NameUse::kMayBeCalled);
  EXPECT_EQ(Use("Rf\"\"\"{x}{total}\"\"\""), NameUse::kMayBeCalled);
  EXPECT_EQ(Use("'''\ntotal"), NameUse::kMayBeCalled);
  EXPECT_EQ(Use("x = 'it\ntotal(1)"), NameUse::kMayBeCalled);  // that string ends with its line
}

}  // namespace
}  // namespace quillet
