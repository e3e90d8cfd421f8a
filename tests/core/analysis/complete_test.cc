// Complete readings: every form of every version, whole and cut short at each token, by analyzers whose nodes
// are recycled and by fresh ones.
#include <gtest/gtest.h>
#include <pthread.h>

#include <memory>
#include <string>
#include <vector>

#include "analysis/file_analyzer.h"
#include "tests/core/support/analysis_helper.h"

namespace quillet {
namespace {

FileAnalyzer::Options CompleteOptions(Version version) {
  const std::string folder = std::string(QUILLET_SOURCE_DIR) + "/resources/pgen-grammars/";
  const bool py3 = version.AtLeast(3, 0);
  FileAnalyzer::Options options;
  options.version = version;
  options.py3_grammar = py3;
  options.grammar_file = folder + (py3 ? kPy3DefaultGrammar : kPy2DefaultGrammar);
  options.hint_grammar_file = folder + kPy3DefaultGrammar;
  for (const Text word : py3 ? Py3Keywords() : Py27Keywords()) options.keywords.emplace_back(word);
  options.hint_keywords = options.keywords;
  options.reads_completely = true;
  return options;
}

constexpr const char* kSources[] = {
    "match x, *y:\n case [a, *_] | {'k': -1 - 2j, **r} | C.D(0, x=(1 as z)) if (n := a): pass\n",
    "case (a.b | 'x' 'y' | None), *rest: x = 1\n",
    "def f[T: (int, str) = int, *Ts = *a, **P](a, /, b: 'B' = 1, *c: *Ts, d, **e) -> 'C[D]':  # type: ignore[x]\n",
    "async def f(x): return [await a async for a in b if c] + (yield)\n",
    "class C(x, metaclass=y, *z, **w): pass\n",
    "with (open(a) as b, c as (d, e.f),): pass\nwith (a): pass\nasync with (a as b): pass\n",
    "except* (A, B) as e: pass\nexcept A, B: pass\nexcept E, (a, b): pass\n",
    "@a[0].b or (lambda x, *y, z=1: x)\n",
    "x = y = *a, [b, *c], {d: e, **f}, {*g}, h if i else j, k ** -l, not m in n, o[p:q:r, *s, ...]\n",
    "a, (b, *[c, d]) = e.f(g, *h, i=j, **k)[l].m\n",
    "x: int = f'{a!r:>{b}} {c[\"d\"]}' t'{e:{f}}' 'g'\n",
    "def g(a, b):  # type: (*int, **str) -> (None)\n# type: (int, (str)) -> x\nx = 1  # type: any text\n",
    "from typing import cast as c, Literal as L\nx = c('A[B]', L['|'])\n",
    "print >>f, `x`, y\nexec a in b, c\nraise E, 'x', y\ndef f(a, (b, (c, d))): pass\nx = lambda (a, b): 0777L\n",
    "del (a), b[c], d.e\nglobal x, y\nnonlocal z\nimport a.b as c, d\nfrom ..a import (b as c, d,)\nassert a, b\n",
    "f(a b)\nf(a=1, b)\nx = (1\nif x = 1: pass\nf() = g() = 1\na, b += 1\nx = 1 if 2\nprint x\nfor a b in c: pass\n",
};

std::string ResultOf(FileAnalyzer& files, const std::string& source) {
  files.Analyze(source);
  std::string shown;
  for (const auto* rows : {&files.store().rows, &files.store().arg_rows})
    for (const Record& record : *rows) shown.append(record.name()).append("\t").append(record.info()).append("\n");
  for (const FileAnalyzer::Failure& error : files.errors())
    shown += std::to_string(error.place.line) + ":" + std::to_string(error.place.col) + " " + error.message() + "\n";
  return shown;
}

TEST(CompleteReading, WhateverIsCutShortIsReadAlikeByRecycledNodes) {
  for (const Version version : {Version::Of(2, 7), Version::Of(3, 6), Version::Of(3, 14)}) {
    const FileAnalyzer::Options options = CompleteOptions(version);
    FileAnalyzer recycled(options);
    for (const std::string source : kSources) {
      FileAnalyzer fresh(options);
      for (size_t size = 0; size <= source.size(); ++size) {
        const std::string part = source.substr(0, size);
        const std::string once = ResultOf(recycled, part);
        // Without its first word, what is left is another statement.
        (void)ResultOf(recycled, source.substr(size));
        ASSERT_EQ(once, ResultOf(fresh, part)) << part;
      }
    }
  }
}

TEST(CompleteReading, NodesOfWhatIsRejectedAreUsedAgain) {
  CPGenAnalyzerImpl analyzer(CompleteOptions(Version::Of(3, 12)));
  const NodePool& pool = analyzer.type_hint_walker().hint_parser().factory().pool();
  const TypingNames typing;
  for (const char* source :
       {"x y", "x = [a, b(c)] d", "f(a, b=1, c)", "def f(a, b)", "x = (1", "if a = b: c", "a.b[c:d"}) {
    size_t nodes = 0;
    for (int round = 0; round < 5; ++round) {
      const testing::CutSource cut(source);
      const std::unique_ptr<LogicalLine> line = cut.Line(0);
      EXPECT_TRUE(analyzer.AnalyzeCompletely(*line, {}, typing, true)) << source;
      if (round > 0) {
        EXPECT_EQ(pool.node_count(), nodes) << source;
      }
      nodes = pool.node_count();
    }
  }
}

TEST(CompleteReading, AFormOfANewerVersionHasItsNamesWhereverItStands) {
  // The set is one that no table reads, so that its statement is not either.
  const struct {
    const char* statement;
    const char* names;  // of its records
  } cases[] = {
      {"if {a := x, b}: pass", "a a x b"},
      {"while {a := x, b}: pass", "a a x b"},
      {"for i in {a := x, b}: pass", "a a i x b"},
      {"with {a := x, b} as i: pass", "i i a a x b"},
      {"return {a := x, b}", "a a return x b"},
      {"assert {a := x, b}, c", "a a x b c"},
      {"raise {a := x, b} from c", "a a x b c"},
      {"class A({a := x, b}, k=c): pass", "A a a x b c"},
      {"def f(p={a := x, b}) -> c: pass", "f a a x b c p p return"},
      {"async for i in {a := x, b}: pass", "a a i x b"},
      {"i = {a := x, b}", "i i a a x b"},
      {"i += {a := x, b}", "a a i x b"},
      {"i: {a := x, b} = c", "a a i i x b c i"},
      {"lambda p={a := x, b}: c", "a a x b c p"},
      {"yield {a := x, b}", "a a yield x b"},
      {"await {a := x, b}", "a a x b"},
      {"[{a := x, b} for i in c if {a := x, b}]", "a a a a x b c i"},
      {"f({a := x, b}, *c, **d)", "a a f x b c d"},
      {"not {a := x, b} or c", "a a x b c"},
      {"{a := x, b} if c else d", "a a x b c d"},
      {"-{a := x, b} ** c", "a a x b c"},
      {"c < {a := x, b} <= d", "a a c x b d"},
      {"({a := x, b})[c].d", "a a x b c ({a := x, b})[c].d"},
      {"{{a := x, b}: c}", "a a x b c"},
      {"(i := {a := x, b})", "i i a a x b"},
  };
  FileAnalyzer files(CompleteOptions(Version::Of(3, 12)));
  for (const auto& [statement, expected] : cases) {
    files.Analyze(std::string("async def g():\n ") + statement + "\n");
    ASSERT_EQ(files.errors().size(), 0u) << statement;
    std::string names;
    for (const auto* rows : {&files.store().rows, &files.store().arg_rows}) {
      for (const Record& record : *rows) {
        if (&record == &files.store().rows[0]) continue;  // of the head
        if (!names.empty()) names += ' ';
        names += record.name();
      }
    }
    EXPECT_EQ(names, expected) << statement;
  }
}

TEST(CompleteReading, ATemplateEndsWhereItsFieldsSay) {
  FileAnalyzer newest(CompleteOptions(Version::Of(3, 14)));
  EXPECT_EQ(ResultOf(newest, "x = t'{a['b']} {c}' # '\n"), ResultOf(newest, "x = t'{a[\"b\"]} {c}' # '\n"));
  EXPECT_EQ(ResultOf(newest, "x = rt'{a['b']}\\' # '\n"), ResultOf(newest, "x = rt'{a[\"b\"]}\\' # '\n"));
  EXPECT_NE(ResultOf(newest, "x = t 'a'\n"), ResultOf(newest, "x = t'a'\n"));
  EXPECT_NE(ResultOf(newest, "x = t'{a['b']}'\n"), ResultOf(newest, "x = s'{a['b']}'\n"));
  FileAnalyzer before(CompleteOptions(Version::Of(3, 13)));
  EXPECT_NE(ResultOf(before, "x = t'{a['b']} {c}'\n"), ResultOf(newest, "x = t'{a['b']} {c}'\n"));
}

TEST(CompleteReading, ExceptionTypesHaveOneCommaBetweenThem) {
  FileAnalyzer files(CompleteOptions(Version::Of(3, 14)));
  for (const auto& [types, is_fine] :
       {std::pair("A, B", true), {"A, B, C", true}, {"A,, B", false}, {", A", false}, {"A,,", false}, {"A B", false}}) {
    files.Analyze(std::string("try: pass\nexcept ") + types + ": pass\n");
    EXPECT_EQ(files.errors().empty(), is_fine) << types;
  }
}

TEST(CompleteReading, ASignatureCommentOfAMethodMayLeaveOutTheObject) {
  FileAnalyzer files(CompleteOptions(Version::Of(3, 12)));
  const auto hints = [&](const std::string& source) {
    files.Analyze(source);
    std::string found;
    for (const Record& record : files.store().arg_rows)
      if (record.info().starts_with(":h:")) found.append(record.name()).append(record.info()).append(" ");
    return found;
  };
  EXPECT_EQ(hints("class A:\n  def m(self, a):  # type: (B, int) -> str\n    pass\n"),
            "self:h:B a:h:int return:h:str ");
  EXPECT_EQ(hints("class A:\n  def m(self, a):  # type: (int) -> str\n    pass\ndef f(b, c):  # type: (int) -> str\n"),
            "a:h:int return:h:str b:h:int return:h:str ");
}

TEST(CompleteReading, DeepNestingIsAnErrorOrIsRead) {
  FileAnalyzer files(CompleteOptions(Version::Of(3, 13)));
  const auto repeated = [](const char* text, int count) {
    std::string all;
    for (int i = 0; i < count; ++i) all += text;
    return all;
  };
  for (const char* open : {"(", "[", "{", "f(", "not ", "-", "lambda: ", "x if y else ", "x ** ", "[*", "(yield "}) {
    for (const int count : {50, 190, 250, 5000}) {
      const std::string inner = repeated(open, count);
      for (const std::string& source : {"x = " + inner + "a\n", "x = = " + inner + "a\n", "case " + inner + "a:\n"})
        (void)ResultOf(files, source);
    }
  }
  EXPECT_EQ(ResultOf(files, "x = " + repeated("(", 150) + "a" + repeated(")", 150) + "\n"), "x\t:s:\nx\ta\na\t:g:\n");
  EXPECT_NE(ResultOf(files, "x = = " + repeated("(", 250) + "a" + repeated(")", 250) + "\n").find("too many nested"),
            std::string::npos);
}

void* ReadTooDeep(void*) {
  const auto repeated = [](const char* text) {
    std::string all;
    for (int i = 0; i < 3000; ++i) all += text;
    return all;
  };
  for (const Version version : {Version::Of(2, 7), Version::Of(3, 13)}) {
    FileAnalyzer files(CompleteOptions(version));
    for (const char* open : {"lambda a=", "lambda: ", "isinstance(a, ", "f(a)(", "a[", "Literal[", "not ",
                             "x if y else ", "[a for b in ", "f(*", "f(k=", "{a: ", "await "}) {
      std::string closed = repeated(open) + "b";
      const char bracket = open[std::string_view(open).find_first_of("([{") % std::string_view(open).size()];
      closed += repeated(bracket == '(' ? ")" : bracket == '[' ? "]" : bracket == '{' ? "}" : "");
      for (const std::string& inner : {repeated(open), closed})
        for (const char* before : {"", "x = ", "x: ", "x = = "}) (void)ResultOf(files, before + inner + "\n");
    }
  }
  return nullptr;
}

TEST(CompleteReading, DeepNestingFitsASmallStack) {
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__) || !defined(NDEBUG)
  pthread_attr_setstacksize(&attributes, size_t{4} << 20);  // frames are several times as large
#else
  pthread_attr_setstacksize(&attributes, size_t{512} << 10);
#endif
  pthread_t thread;
  ASSERT_EQ(pthread_create(&thread, &attributes, &ReadTooDeep, nullptr), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

// Long lists of names are compared by a table.
TEST(CompleteReading, ANameThatComesTwiceInALongListIsFound) {
  FileAnalyzer files(CompleteOptions(Version::Of(3, 13)));
  const auto names = [](const char* text, int first, int behind, const char* more = "") {
    std::string all;
    for (int i = first; i < behind; ++i) all += text + std::to_string(i) + more + ", ";
    return all;
  };
  const auto error = [&files](const std::string& source) {
    files.Analyze(source);
    return files.errors().empty() ? "" : files.errors()[0].message();
  };
  for (const int count : {10, 40}) {
    const std::string all = names("a", 0, count), keywords = names("a", 0, count, "=1");
    EXPECT_EQ(error("def f(" + all + "): pass\n"), "");
    EXPECT_EQ(error("def f(" + all + "a3): pass\n"), "duplicate argument 'a3' in function definition");
    EXPECT_EQ(error("f(" + keywords + "**{})\n"), "");
    EXPECT_EQ(error("f(" + keywords + "b=f(" + keywords + "))\n"), "");
    EXPECT_EQ(error("f(" + keywords + "a3=1)\n"), "keyword argument repeated: a3");
    EXPECT_EQ(error("type X[" + all + "a3] = int\n"), "duplicate type parameter 'a3'");
    const std::string match = "match x:\n  case ";
    EXPECT_EQ(error(match + "[" + all + "]: pass\n"), "");
    EXPECT_EQ(error(match + "[" + all + "a3]: pass\n"), "multiple assignments to name 'a3' in pattern");
    EXPECT_EQ(error(match + "[" + all + "] | (" + names("a", 1, count) + "a0): pass\n"), "");
    EXPECT_EQ(error(match + "[" + all + "] | (" + names("a", 1, count) + "b): pass\n"),
              "alternative patterns bind different names");
    EXPECT_EQ(error(match + "A(" + names("a", 0, count, "=1") + "a3=2): pass\n"),
              "attribute name repeated in class pattern: a3");
  }
}

// Sources whose lines stand where nobody would put them.
constexpr const char* kPlaces[] = {
    "def f():\n  x\n  # c\n\ny\n# d\nclass C:\n  def g(self):\n    z\n  a = 1\nb\n",
    "async def f():\n    if x:\n        a\n      b\n   c\n  d\ne\n",
    "def f():\n        x\n\ty\n    z\n\tdef g():\n\t    a\n  b\n",
    "def f(): a; b\n# c\n    d\nclass C: x = 1; y\n  def g(self): pass\nz\n",
    "x; def f():\n  y\n  def g(): a; class D: b; async def h(): c\n  # d\n  e\nf\n",
    "def f(\nclass C(\n  x\ndef g(:\n# c\n  y\nz\n",
    "class C:\n  def f(self):\n    x\n\\\n\n    y\n  z\n\\\n",
    "if a:\n  def f():\n    b\n  else: c\n@d\n  def g():\n    try: e\n    x\n except: y\nz\n",
};

// In a complete reading places are told by the rules of blocks.
TEST(CompleteReading, PlacesAreTheSameWhateverIsWrongWithTheBlocks) {
  FileAnalyzer files(CompleteOptions(Version::Of(3, 12)));
  for (const std::string source : kPlaces) {
    for (size_t length = 0; length <= source.size(); ++length) {
      files.Analyze(source.substr(0, length) + source.substr(std::min(length + 2, source.size())));
      ScopeTracker scopes;
      for (size_t row = 0; row < files.rows().size(); ++row) {
        LinePlace expected;
        scopes.Next(files.rows()[row], expected);
        const LinePlace& place = files.results()[row];
        ASSERT_TRUE(place == expected) << source << " without what stands at " << length << ", row " << row;
      }
    }
  }
}

TEST(CompleteReading, BytesBesideTextAreAnErrorHoweverTheyAreSetApart) {
  FileAnalyzer files(CompleteOptions(Version::Of(3, 12)));
  const auto has_error = [&](const char* source) {
    files.Analyze(source);
    return !files.errors().empty();
  };
  for (const char* source : {"x = b'a' 'b'\n", "x = 'a' b'b'\n", "x = (b'a'\n  'b')\n", "x = ('a'\n  b'b')\n",
                             "x = (b'a' # c\n 'b')\n", "x = b'a' \\\n 'b'\n", "x = b'a'\t'b'\n", "x = b'a' f'{b}'\n",
                             "x = b'a' Rb'b' r'c'\n", "x = b'a'u'b'\n", "x = b'\\x4'\n", "x = b'\xc3\xa9'\n"})
    EXPECT_TRUE(has_error(source)) << source;
  for (const char* source : {"x = b'a' b'b', 'c'\n", "x = [b'\\x4f', 'b'] if b'' in b else 'f'\n", "x = b'\\N'\n'b'\n"})
    EXPECT_FALSE(has_error(source)) << source;
}

}  // namespace
}  // namespace quillet
