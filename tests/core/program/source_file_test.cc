// Places of a file: which occurrence and which scope stands there, and what opens a scope.
#include "program/source_file.h"

#include <gtest/gtest.h>

#include <string>

#include "program/files.h"
#include "tests/core/support/names_helper.h"

namespace quillet {
namespace {

class OneFile {
 public:
  explicit OneFile(std::string text, Version version = Version::Of(3, 12)) : files_(version), text_(text) {
    const FileId id = files_.NumberOf("/one.py");
    files_.Open(id, std::move(text));
    file_ = files_.Get(id);
  }
  const SourceFile* operator->() const { return file_; }

  // The scope of a place in words, and of that behind the first occurrence of a text.
  std::string ScopeAt(uint32_t offset) const { return testing::ScopeWord(file_->bindings, file_->ScopeAt(offset)); }
  std::string ScopeBehind(Text text) const { return ScopeAt(static_cast<uint32_t>(text_.find(text) + text.size())); }
  std::string OccurrenceAt(uint32_t offset) const {
    const uint32_t index = file_->OccurrenceAt(offset);
    return index == kNoIndex ? "-" : std::string(file_->bindings.TextOf(file_->bindings.occurrences[index]));
  }

 private:
  Files files_;
  std::string text_;
  const SourceFile* file_;
};

TEST(SourceFile, FindsOccurrences) {
  const OneFile file("ab = c.de\n");
  EXPECT_EQ(file.OccurrenceAt(0), "ab");
  EXPECT_EQ(file.OccurrenceAt(1), "ab");
  EXPECT_EQ(file.OccurrenceAt(2), "ab");
  EXPECT_EQ(file.OccurrenceAt(3), "-");
  EXPECT_EQ(file.OccurrenceAt(5), "c");
  EXPECT_EQ(file.OccurrenceAt(6), "c");
  EXPECT_EQ(file.OccurrenceAt(7), "de");
  EXPECT_EQ(file.OccurrenceAt(1000), "-");
  EXPECT_EQ(file->OccurrenceBeginningAt(7), 2u);
  EXPECT_EQ(file->OccurrenceBeginningAt(8), kNoIndex);
  EXPECT_EQ(OneFile("").OccurrenceAt(0), "-");
}

TEST(SourceFile, CountsPlacesFromOneInBytes) {
  const OneFile file("a\n\xC3\xA4 = b\r\nc");
  EXPECT_EQ(file->PlaceOf(0), (Position{1, 1}));
  EXPECT_EQ(file->PlaceOf(7), (Position{2, 6}));
  EXPECT_EQ(file->PlaceOf(10000), (Position{3, 2}));
  EXPECT_EQ(file->OffsetOf(2, 6), 7u);
  EXPECT_EQ(file->OffsetOf(2, 100), 8u);  // in front of the line's end
  EXPECT_EQ(file->OffsetOf(2, -5), 2u);
  EXPECT_EQ(file->OffsetOf(0, 5), 0u);
  EXPECT_EQ(file->OffsetOf(3, 1), 10u);
  EXPECT_EQ(file->OffsetOf(99, 1), 11u);
  EXPECT_EQ(OneFile("")->OffsetOf(1, 1), 0u);
  EXPECT_EQ(OneFile("\xEF\xBB\xBF"
                    "a = 1\n")
                ->OffsetOf(1, 1),
            3u);
}

TEST(SourceFile, KnowsTheScopeOfAPlace) {
  const OneFile file(
      "import a\n"                                   // 1
      "@deco(1)\n"                                   // 2
      "class C(Base):\n"                             // 3
      "    x = 1\n"                                  // 4
      "    @prop\n"                                  // 5
      "    def m(self, y=z):\n"                      // 6
      "        if y:\n"                              // 7
      "            return (self\n"                   // 8
      "  .more)\n"                                   // 9
      "\n"                                           // 10
      "        \n"                                   // 11
      "    def n(self): pass\n"                      // 12
      "async def f[T](p: T): return p\n"             // 13
      "l = lambda q, d=e: q + g\n"                   // 14
      "c = [i + j for i in k(h) if i for o in i]\n"  // 15
      "print(v for v in w)\n");                      // 16
  EXPECT_EQ(file.ScopeBehind("impo"), "module");
  EXPECT_EQ(file.ScopeBehind("@dec"), "module");
  EXPECT_EQ(file.ScopeBehind("Bas"), "module");
  EXPECT_EQ(file.ScopeBehind("x ="), "C");
  EXPECT_EQ(file.ScopeBehind("@pro"), "C");
  EXPECT_EQ(file.ScopeBehind("y=z"), "C");
  EXPECT_EQ(file.ScopeBehind("if "), "m");
  EXPECT_EQ(file.ScopeBehind("(self\n  .mo"), "m");
  EXPECT_EQ(file.ScopeAt(file->OffsetOf(10, 1)), "C");
  EXPECT_EQ(file.ScopeAt(file->OffsetOf(11, 1)), "C");
  EXPECT_EQ(file.ScopeAt(file->OffsetOf(11, 5)), "C");
  EXPECT_EQ(file.ScopeAt(file->OffsetOf(11, 9)), "m");
  EXPECT_EQ(file.ScopeBehind("n(self): pa"), "n");
  EXPECT_EQ(file.ScopeBehind("retu"), "m");
  EXPECT_EQ(file.ScopeBehind("T): return "), "f");
  EXPECT_EQ(file.ScopeBehind("d=e"), "module");
  EXPECT_EQ(file.ScopeBehind("q + "), "lambda");
  EXPECT_EQ(file.ScopeBehind("[i + "), "comprehension");
  EXPECT_EQ(file.ScopeBehind("for i in "), "module");
  EXPECT_EQ(file.ScopeBehind("in k("), "module");
  EXPECT_EQ(file.ScopeBehind("in k(h)"), "module");
  EXPECT_EQ(file.ScopeBehind("in k(h) "), "comprehension");
  EXPECT_EQ(file.ScopeBehind("if i for o in "), "comprehension");
  EXPECT_EQ(file.ScopeBehind("print(v f"), "comprehension");
  EXPECT_EQ(file.ScopeBehind("print"), "module");
  for (uint32_t offset = 0; offset < 1000; ++offset) file->ScopeAt(offset);
}

TEST(SourceFile, KnowsTheScopeOfWhatIsBeingWritten) {
  const OneFile file("class C:\n    def m(self):\n        ");
  EXPECT_EQ(file.ScopeAt(file->OffsetOf(3, 9)), "m");
  EXPECT_EQ(file.ScopeAt(file->OffsetOf(3, 5)), "C");
  const OneFile open("def f(a):\n    x = g(\n\ndef h():\n    y\n");
  EXPECT_EQ(open.ScopeAt(open->OffsetOf(2, 11)), "f");
  EXPECT_EQ(open.ScopeAt(open->OffsetOf(5, 6)), "h");
}

// What opens a scope, and the scope that it opens, find each other.
void CheckScopes(const OneFile& file, size_t opened) {
  size_t found = 0;
  for (uint32_t scope = 1; scope < file->bindings.scopes.size(); ++scope) {
    const StmtId stmt = file->StmtOfScope(scope);
    const ExprId expr = file->ExprOfScope(scope);
    if (stmt != kModuleStmt) {
      EXPECT_EQ(file->ScopeOfStmt(stmt), scope);
    }
    if (expr != kNoExpr) {
      EXPECT_EQ(file->ScopeOfExpr(expr), scope);
    }
    found += stmt != kModuleStmt || expr != kNoExpr;
  }
  EXPECT_EQ(found, opened);
}

TEST(SourceFile, MatchesScopesWithWhatOpensThem) {
  CheckScopes(OneFile("class C[T](B):\n  def m[U](self, x: U) -> T: return [a for a in (b for b in c)]\n"), 4);
  CheckScopes(OneFile("@d(lambda: 1)\nasync def f(x=lambda: {k: v for k, v in x}): yield\n"), 4);
  CheckScopes(
      OneFile("f(x for x in y)\nf( # words\n  [i for i in j] for k in l)\nf((x for x in y), *(z for z in w))\n"), 5);
  CheckScopes(OneFile("((x for x in y))\nz = (lambda: 0)\n{a for a in {b: c for b, c in d}}\n"), 4);
  CheckScopes(OneFile("f'{[x for x in y]} {(lambda: 1)}'\n"), 2);
  CheckScopes(OneFile("f([a for a in b] for x in y)\nf((a for a in b) for x in y)\n"), 4);
  CheckScopes(OneFile("x = [i for i in j]\ny = (i for i in j)\n", Version::Of(2, 7)), 1);
  CheckScopes(OneFile("def f(a: 'lambda: 1'): # type: (int) -> str\n  x = lambda: (lambda: 2)\n"), 4);
}

}  // namespace
}  // namespace quillet
