// The index and its questions: words of names, what a question needs, which records answer, and that the
// bytes of an index hold what was put in, are noticed when they are damaged and do no harm when planted.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "foundations/errors.h"
#include "index/answer_lines.h"
#include "index/bytes.h"
#include "index/counts.h"
#include "index/name_index.h"
#include "index/places.h"
#include "index/question.h"
#include "index/words.h"
#include "tests/core/support/analyzer_helper.h"
#include "tests/core/support/expect_error.h"
#include "tests/core/support/temporary_folder.h"

namespace quillet {
namespace {

using Match = Question::Match;

// What a writer writes of a source, of which the statements that it wants are analysed, or all.
std::string Written(FileWriter& writer, Text source, bool filters = true) {
  static FileAnalyzer file(FileAnalyzer::Options{testing::AnalyzerOptions(testing::kPy3), {}});
  ScopeNames scopes;
  PlacedRecords placed;
  file.Analyze(source, filters ? writer.row_filter() : nullptr);
  scopes.Build(file);
  std::string out;
  writer.Write(BatchInput{"t.py", {}, {}}, file, scopes, placed, out);
  return out;
}

std::vector<std::string> Words(Text name, size_t from = 0) {
  std::vector<std::string> words;
  ForEachWord(name, from, [&](Text word, bool is_last) { words.push_back(std::string(word) + (is_last ? "!" : "")); });
  return words;
}

TEST(Words, AreRunsOfLettersDigitsAndUnderscores) {
  EXPECT_EQ(Words("os.path.join"), (std::vector<std::string>{"os", "path", "join!"}));
  EXPECT_EQ(Words("x['a b'][0]"), (std::vector<std::string>{"x", "a", "b", "0!"}));
  EXPECT_EQ(Words("*"), std::vector<std::string>{"*!"});
  EXPECT_EQ(Words("gr\xC3\xBC\xC3\x9F.e"), (std::vector<std::string>{"gr\xC3\xBC\xC3\x9F", "e!"}));
  EXPECT_EQ(Words(""), std::vector<std::string>{"!"});
  EXPECT_EQ(Words(std::string(200, 'x')), std::vector<std::string>{std::string(kMaxWordSize, 'x') + "!"});
}

TEST(Words, OfANameBehindItsBeginningAreThoseThatEndThere) {
  EXPECT_EQ(Words("a.b.c", 3), (std::vector<std::string>{"b", "c!"}));
  EXPECT_EQ(Words("a.b()", 3), (std::vector<std::string>{"b!"}));
  EXPECT_EQ(Words("a()", 2), std::vector<std::string>());
}

TEST(Words, TablesNumberWordsInOrder) {
  WordTable table;
  for (int round = 0; round < 2; ++round) {
    table.Clear();
    const std::string letter(1, static_cast<char>('v' + round));
    for (uint32_t i = 0; i < 5000; ++i) {
      const std::string word = letter + std::to_string(i);
      EXPECT_EQ(table.NumberOfCopy(word), i);
      EXPECT_EQ(table.NumberOfCopy(word), i);
    }
    EXPECT_EQ(table[4321].word, letter + "4321");
    EXPECT_EQ(table.entries().size(), 5000u);
  }
}

TEST(Words, OfAFileHaveTheUsesOfTheirRecords) {
  const auto writer = MakeWordsWriter(testing::kPy3);
  const std::string written =
      Written(*writer, "import os.path\nclass Shop:\n  def add(self, item):\n    self.items.append(1)\n");
  FileWords words;
  ASSERT_TRUE(ReadFileWords(written, words));
  EXPECT_GT(words.records, 8u);
  const auto uses_of = [&](Text name) {
    for (const auto& [word, uses] : words.words) {
      if (word == name) return uses;
    }
    return Uses{0};
  };
  EXPECT_EQ(uses_of("os"), UseOfKind(RecordKind::kSet) | UseOfKind(RecordKind::kImport) | UseOfRole(NameRole::kImport));
  const Uses defined = UseOfKind(RecordKind::kSet) | kScopeUse | UseOfRole(NameRole::kDefinition) | kDefineUse;
  EXPECT_EQ(uses_of("Shop"), defined);
  EXPECT_EQ(uses_of("add"), defined);
  EXPECT_EQ(uses_of("path"), UseOfRole(NameRole::kImport));
  EXPECT_NE(uses_of("item") & kParameterUse, 0u);
  EXPECT_NE(uses_of("append") & UseOfKind(RecordKind::kCalled), 0u);
  EXPECT_FALSE(ReadFileWords(Text(written).substr(0, written.size() - 1), words));
  EXPECT_FALSE(ReadFileWords(written + "x", words));
}

TEST(Words, OfAFileAreTheSameBehindAnother) {
  const Text source = "import b\nb.a(c=a)\n";
  const auto fresh = MakeWordsWriter(testing::kPy3);
  const auto used = MakeWordsWriter(testing::kPy3);
  (void)Written(*used, "a = b = c = d\n");
  EXPECT_EQ(Written(*used, source), Written(*fresh, source));
}

// The beginning of a chain is looked for from each of its attributes, but not from afar.
TEST(Words, OfAChainOnManyLinesHaveTheirUses) {
  const auto writer = MakeWordsWriter(testing::kPy3);
  const auto uses_of_last = [&](size_t lines) {
    std::string source = "raise (a";
    for (size_t i = 0; i < lines; ++i) source += "\n.b";
    const std::string written = Written(*writer, source + ")\n");
    FileWords words;
    EXPECT_TRUE(ReadFileWords(written, words));
    const auto found = std::ranges::find(words.words, "b", &WordTable::Entry::word);
    return found != words.words.end() ? found->uses : Uses{0};
  };
  EXPECT_NE(uses_of_last(30) & kRaiseUse, 0u);
  EXPECT_NE(uses_of_last(50'000) & UseOfRole(NameRole::kRead), 0u);
}

TEST(Bytes, ReadersNeverLeaveTheirBytes) {
  std::string bytes;
  for (const uint64_t value : {uint64_t{0}, uint64_t{127}, uint64_t{128}, uint64_t{1} << 40, UINT64_MAX})
    AppendNumber(value, bytes);
  AppendText("text", bytes);
  AppendFixed(0x0123456789ABCDEF, bytes);
  ByteReader reader(bytes);
  EXPECT_EQ(reader.Number(), 0u);
  EXPECT_EQ(reader.Number(), 127u);
  EXPECT_EQ(reader.NumberUpTo(128), 128u);
  EXPECT_EQ(reader.Number(), uint64_t{1} << 40);
  EXPECT_EQ(reader.Number(), UINT64_MAX);
  EXPECT_EQ(reader.String(), "text");
  EXPECT_EQ(reader.Fixed(), 0x0123456789ABCDEFu);
  EXPECT_FALSE(reader.failed());
  EXPECT_EQ(reader.Number(), 0u);
  EXPECT_TRUE(reader.failed());
  for (const Text bad : {Text("\x80", 1), Text("\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\x01", 11),
                         Text("\x05"
                              "ab",
                              3)}) {
    ByteReader of_bad(bad);
    of_bad.String();
    EXPECT_TRUE(of_bad.failed());
    EXPECT_EQ(of_bad.left(), 0u);
  }
  ByteReader above(Text("\x05", 1));
  above.NumberUpTo(4);
  EXPECT_TRUE(above.failed());
}

TEST(Hash, DiffersWhereEightBytesDiffer) {
  std::set<uint64_t> seen{HashOfBytes(""), HashOfBytes(Text("\0", 1))};
  EXPECT_EQ(seen.size(), 2u);
  const std::string text(100, 'a');
  seen = {HashOfBytes(text)};
  for (size_t i = 0; i < text.size(); ++i) {
    for (int bit = 0; bit < 8; ++bit) {
      std::string other = text;
      other[i] = static_cast<char>(other[i] ^ 1 << bit);
      EXPECT_TRUE(seen.insert(HashOfBytes(other)).second);
    }
  }
}

TEST(Glob, StarsAreAnyTextAndMarksOneCharacter) {
  EXPECT_TRUE(FitsGlob("", ""));
  EXPECT_TRUE(FitsGlob("", "*"));
  EXPECT_FALSE(FitsGlob("", "?"));
  EXPECT_TRUE(FitsGlob("abc", "a*c"));
  EXPECT_TRUE(FitsGlob("abcbc", "a*bc"));
  EXPECT_FALSE(FitsGlob("abcb", "a*bc"));
  EXPECT_TRUE(FitsGlob("a.b", "?.?"));
  EXPECT_TRUE(FitsGlob("\xC3\xBC", "?"));
  EXPECT_FALSE(FitsGlob("\xC3\xBC", "??"));
  EXPECT_TRUE(FitsGlob("[a]", "[a]"));
  EXPECT_FALSE(FitsGlob("a", "[a]"));
  EXPECT_TRUE(FitsGlob("test_x", "**x*"));
  EXPECT_FALSE(FitsGlob("ab", "a"));
  EXPECT_FALSE(FitsGlob(std::string(2000, 'a'), std::string(50, '*') + "b"));
}

// ---- questions ----

constexpr Text kShop =
    "import os.path\n"
    "LIMIT = 10\n"
    "class Shop:\n"
    "    def add(self, item, count=1):\n"
    "        self.items.append(item)\n"
    "        return self.items\n"
    "    def path(self, name):\n"
    "        return os.path.join('shop', name)\n";

Question QuestionFor(Match match, Text name, Uses uses = kAllUses) {
  Question question;
  question.match = match;
  question.name = name;
  question.uses = uses;
  return question;
}

// The answers as "line:column name", in their order.
TEST(Glob, WordsAreAlikeButForTheCaseOfLetters) {
  WordTable table;
  for (const Text word : {"item", "Item", "items", "ITEM", "reitem", "\u00E9tem"}) table.NumberOfCopy(word);
  const auto alike = [&](Text pattern) {
    std::vector<std::string> words;
    for (const Text word : WordsAlike(table.entries(), pattern)) words.emplace_back(word);
    return words;
  };
  using Strings = std::vector<std::string>;
  EXPECT_EQ(alike("iTem"), (Strings{"item", "Item", "ITEM"}));
  EXPECT_EQ(alike("item"), (Strings{"Item", "ITEM"}));
  EXPECT_EQ(alike("ITEM*"), (Strings{"item", "Item", "items"}));
  EXPECT_EQ(alike("*ITEM"), (Strings{"item", "Item", "reitem"}));
  EXPECT_EQ(alike("?TEM"), (Strings{"item", "Item", "\u00E9tem"}));
  EXPECT_EQ(alike("*"), Strings{});
}

std::vector<std::string> AnswersIn(Text source, const Question& question) {
  const auto writer = MakeQuestionWriter(question, testing::kPy3, MakeAnswerBytes(false));
  std::vector<std::string> found;
  EXPECT_TRUE(ReadAnswers(Written(*writer, source), [&](const Answer& answer, Text) {
    found.push_back(std::to_string(answer.line) + ":" + std::to_string(answer.column) + " " + std::string(answer.name));
  }));
  return found;
}

using Found = std::vector<std::string>;

TEST(Questions, AreAnsweredByNameAndUse) {
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kExact, "LIMIT", UseOfKind(RecordKind::kSet))), Found{"2:1 LIMIT"});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kExact, "LIMIT", UseOfKind(RecordKind::kGet))), Found{});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kExact, "item", kParameterUse)), Found{"4:19 item"});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kSuffix, ".join", UseOfKind(RecordKind::kCalled))),
            Found{"8:16 os.path.join"});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kSuffix, "path", UseOfKind(RecordKind::kSet))), Found{"7:9 path"});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kSuffix, ".path", UseOfKind(RecordKind::kSet))), Found{});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kSuffix, ".LIMIT", UseOfKind(RecordKind::kSet))), Found{});
  EXPECT_EQ(AnswersIn("from . import shop\n", QuestionFor(Match::kSuffix, ".shop", UseOfKind(RecordKind::kFromImport))),
            Found{});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kGlob, "self.?tems", UseOfKind(RecordKind::kGet))),
            (Found{"5:9 self.items", "6:16 self.items"}));
}

TEST(Questions, FindTheMemberOfAScope) {
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kExact, "Shop.add")), Found{"4:9 add"});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kExact, "hop.add")), Found{});
  EXPECT_EQ(AnswersIn(kShop, QuestionFor(Match::kExact, "Shop.add", UseOfKind(RecordKind::kGet))), Found{});
}

TEST(Questions, FindWhatFunctionsReturn) {
  Question question = QuestionFor(Match::kExact, "Shop.add", 0);
  question.returns = true;
  const Found found = AnswersIn(kShop, question);
  ASSERT_FALSE(found.empty());
  for (const std::string& answer : found) EXPECT_EQ(answer, "6:9 return");
  question.name = "Sho.add";
  EXPECT_EQ(AnswersIn(kShop, question), Found{});
}

TEST(Questions, FindOccurrencesThatNoRecordTellsOf) {
  const Text source = "@plain\nclass A(plain.B, k=1):\n  x = f(a=1) + f(2) + f(*x) + g().f(b=3)\n  raise plain(E)\n";
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kExact, "f", UseOfRole(NameRole::kCall))),
            (Found{"3:7 f", "3:16 f", "3:23 f"}));
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kSuffix, ".f", UseOfRole(NameRole::kCall))), Found{"3:35 .f"});
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kExact, "plain", kDecoratorUse)), Found{"1:2 plain"});
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kExact, "plain.B", kBaseUse)), Found{"2:9 plain.B"});
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kExact, "plain", kRaiseUse)), Found{"4:9 plain"});
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kGlob, "?", UseOfRole(NameRole::kKeyword))),
            (Found{"2:18 k", "3:9 a", "3:37 b"}));
  const Uses calls = UseOfKind(RecordKind::kCalled) | UseOfRole(NameRole::kCall);
  EXPECT_EQ(AnswersIn(source, QuestionFor(Match::kExact, "plain", calls)), Found{"4:9 plain"});
}

TEST(Questions, FindWhatStandsBehindCallsHoweverTheseAreSpelt) {
  const auto found = [](Text source, RecordKind kind, NameRole role) {
    return AnswersIn(source, QuestionFor(Match::kSuffix, ".f", UseOfKind(kind) | UseOfRole(role)));
  };
  EXPECT_EQ(found("x = g(1).f\n", RecordKind::kGet, NameRole::kRead), Found{"1:10 g(1).f"});
  EXPECT_EQ(found("\nx = g( 1 ).f\n", RecordKind::kGet, NameRole::kRead), Found{"2:12 g(1).f"});
  EXPECT_EQ(found("x = g( 1 )[\n0].f\n", RecordKind::kGet, NameRole::kRead), Found{"2:4 g(1)[0].f"});
  // The text of a record has no string of the source in it, so that it may seem to begin farther behind.
  EXPECT_EQ(found("x = '[a]'.f(''.g).h\n", RecordKind::kGet, NameRole::kCall), Found{"1:11 ''.f"});
  // Of two statements in a line, each has its own.
  EXPECT_EQ(found("a[ 1 ].f = 2; g( 1 ).f\n", RecordKind::kSet, NameRole::kWrite), Found{"1:8 .f"});
  EXPECT_EQ(found("a[ 1 ].f = 2; g( 1 ).f\n", RecordKind::kGet, NameRole::kRead), Found{"1:22 g(1).f"});
}

TEST(Questions, StayInAScope) {
  Question question = QuestionFor(Match::kExact, "name");
  question.has_scope = true;
  question.scope = "path";
  EXPECT_EQ(AnswersIn(kShop, question), (Found{"7:20 name", "8:37 name"}));
  question.scope = "pat";
  EXPECT_EQ(AnswersIn(kShop, question), Found{});
  question.scope = "*.p?th";
  EXPECT_EQ(AnswersIn(kShop, question).size(), 2u);
  question.scope = "";
  EXPECT_EQ(AnswersIn(kShop, question), Found{});
}

TEST(Questions, AreAnsweredAlikeOutOfTheStatementsThatHoldTheirWord) {
  const Text sources[] = {
      kShop,
      "def f():\n  global x, y\n  x = 1; y.z = x\nx = 2\nclass A:\n  def x(self): return x\n",
      "def f():\n  x = 1\n  def g():\n    nonlocal x\n    x.y = 2; x += 1\n  def h(x): x.y\n",
      "def f() -> A: yield A\n",
      "def f(a, b):\n  # type: (int, A.b) -> C\n  a.b = b  # type: A\n  return a\n",
      "from a.b import c as d, e\nimport a.b.c\nd.c(e, c=1)\n",
      "x: 'A.B[C]' = f'{A.c!r:{C}}'\n\n\nif A: x; A\nelse: C.A\n  # A\n",
      "a = (b +\n  c)\n\n@a\nclass c(b, metaclass=a): b = c\n",
      "x = (A\ndef A(: pass\nA B\n",
      "\n\nA",
      "",
  };
  for (const Text source : sources) {
    for (const Match match : {Match::kExact, Match::kSuffix, Match::kGlob}) {
      for (const Text name : {"x", "A", "b", "c", "f", "x.y", ".y", "A.x", "a.b", "f.x", "C", "a.b.c", "Shop.add", "*",
                              "return", "yield"}) {
        for (const bool returns : {false, true}) {
          Question question = QuestionFor(match, name);
          question.returns = returns;
          const auto writer = MakeQuestionWriter(question, testing::kPy3, MakeAnswerBytes(true));
          EXPECT_EQ(Written(*writer, source, true), Written(*writer, source, false)) << source << name;
        }
      }
    }
  }
}

TEST(Questions, TellRecordsFromOtherOccurrences) {
  const auto kinds = [](Text source, Text name) {
    const auto writer = MakeQuestionWriter(QuestionFor(Match::kExact, name), testing::kPy3, MakeAnswerBytes(false));
    std::vector<std::string> found;
    EXPECT_TRUE(ReadAnswers(Written(*writer, source), [&](const Answer& answer, Text) {
      found.push_back((answer.is_record ? "" : "also ") + std::string(KindWordOf(answer)));
    }));
    return found;
  };
  EXPECT_EQ(kinds("x = 1\nx.y\n", "x"), (Found{"set", "literal", "get"}));
  EXPECT_EQ(kinds("global x\nf(x=1)\n@x\ndef g(): pass\n", "x"), (Found{"global", "also keyword", "called", "get"}));
}

TEST(Questions, HandOnTheSourceLineCutWhereItIsLong) {
  const Question question = QuestionFor(Match::kExact, "x");
  const std::string source = "x = 1; x = 2\r\ny\nx = '" + std::string(9000, 'a') + "'";
  const auto writer = MakeQuestionWriter(question, testing::kPy3, MakeAnswerBytes(true));
  std::vector<std::string> lines;
  const std::string written = Written(*writer, source);
  ASSERT_TRUE(ReadAnswers(written, [&](const Answer&, Text line) { lines.emplace_back(line); }));
  ASSERT_GE(lines.size(), 3u);
  EXPECT_EQ(lines.front(), "x = 1; x = 2");
  EXPECT_EQ(lines[1], "x = 1; x = 2");
  EXPECT_EQ(lines.back().size(), 4096u);
  EXPECT_FALSE(ReadAnswers("", [](const Answer&, Text) {}));
  EXPECT_FALSE(ReadAnswers(Text(written).substr(2), [](const Answer&, Text) {}));
}

// ---- lines ----

using Form = AnswerLinesOptions::Form;

AnswerLinesOptions LinesAs(Form form) { return {form, false, {}}; }

// The lines of a question's answers, and the number of their places in front of them.
std::string LinesIn(Text source, const Question& question, const AnswerLinesOptions& options) {
  const auto writer = MakeQuestionWriter(question, testing::kPy3, MakeAnswerLines(options));
  const std::string written = Written(*writer, source);
  const std::optional<AnswerLines> lines = ReadAnswerLines(written);
  return lines ? std::to_string(lines->place_count) + "\n" + std::string(lines->lines) : "none";
}

TEST(AnswersAsLines, ArePlacesWithTheirSource) {
  const Question question = QuestionFor(Match::kExact, "a");
  EXPECT_EQ(LinesIn("  a = a\t \n", question, {}), "2\nt.py:1:3: a = a\nt.py:1:7: a = a\n");
  EXPECT_EQ(LinesIn("b\n", question, {}), "0\n");
  EXPECT_EQ(LinesIn("a = a", question, LinesAs(Form::kNone)), "2\n");
  EXPECT_EQ(LinesIn("a", question, {Form::kPlaces, false, "t."}), "1\npy:1:1: a\n");
  EXPECT_EQ(LinesIn("a", question, {Form::kPlaces, true, {}}), "1\n\x1b[36mt.py:1:1:\x1b[0m a\n");
}

TEST(AnswersAsLines, AreSafeAndCutWhereTheyAreLong) {
  const Question question = QuestionFor(Match::kExact, "a");
  const std::string long_line = "a = '" + std::string(300, 'x') + "'";
  EXPECT_EQ(LinesIn(long_line, question, {}), "1\nt.py:1:1: " + long_line.substr(0, 159) + "\xE2\x80\xA6\n");
  const std::string wide = "a = '" + std::string(155, 'x') + "\xC3\xBC\xC3\xBC'";
  EXPECT_EQ(LinesIn(wide, question, {}), "1\nt.py:1:1: " + wide.substr(0, 159) + "\xE2\x80\xA6\n");
  EXPECT_EQ(LinesIn("a = '\x1b[0m'", question, {}), "1\nt.py:1:1: a = '\\x1b[0m'\n");
  EXPECT_EQ(LinesIn("a = '\x7F~'", question, {}), "1\nt.py:1:1: a = '\\x7f~'\n");
  EXPECT_EQ(LinesIn("a = '\xC3\xBC'", question, {}), "1\nt.py:1:1: a = '\xC3\xBC'\n");
}

TEST(AnswersAsLines, SayWhatIsSaidOfTheName) {
  const Text source = "def f(a: int):\n  del a\n  g(a=a.b(1))\n  import a.c\n";
  EXPECT_EQ(LinesIn(source, QuestionFor(Match::kExact, "a"), LinesAs(Form::kLong)),
            "5\n"
            "t.py:1:7: def f(a: int):\n"
            "    a  parameter  in f\n"
            "    a  hint int  in f\n"
            "t.py:2:7: del a\n"
            "    a  read  in f\n"
            "t.py:3:5: g(a=a.b(1))\n"
            "    a  passed as a keyword  in f\n"
            "t.py:3:7: g(a=a.b(1))\n"
            "    a  read  in f\n"
            "t.py:4:10: import a.c\n"
            "    a  set  in f\n"
            "    a  import a  in f\n");
  EXPECT_EQ(LinesIn(source, QuestionFor(Match::kExact, "a", UseOfRole(NameRole::kDelete)), LinesAs(Form::kLong)),
            "1\nt.py:2:7: del a\n    a  deleted  in f\n");
}

TEST(AnswersAsLines, AreObjectsForPrograms) {
  const std::string line =
      LinesIn("@o.a\nclass C: 'q\xC3\xBC'", QuestionFor(Match::kExact, "o.a", kDecoratorUse), LinesAs(Form::kJson));
  EXPECT_EQ(line,
            "1\n{\"type\":\"record\",\"path\":\"t.py\",\"line\":1,\"column\":2,\"scope\":\"\",\"name\":\"o.a\","
            "\"kind\":\"get\",\"detail\":\"\",\"is_parameter\":false,\"source\":\"@o.a\",\"changed\":false,"
            "\"role\":\"read\",\"flags\":[\"decorator\"],\"receiver\":\"o\"}\n");
}

TEST(AnswersAsLines, AreToldFromOtherBytes) {
  EXPECT_FALSE(ReadAnswerLines("").has_value());
  EXPECT_FALSE(ReadAnswerLines("1234567").has_value());
}

// ---- the index ----

struct Repository {
  NameIndexWriter writer;

  void Add(const std::string& path, Text source, int64_t time = 7) {
    const auto words = MakeWordsWriter(testing::kPy3);
    IndexedFile file;
    file.path = path;
    file.size = source.size();
    file.time = time;
    file.lines = 3;
    ASSERT_TRUE(writer.Add(file, Written(*words, source)).has_value());
  }
};

std::vector<std::string> PathsFor(const NameIndex& index, const Question& question) {
  std::vector<std::string> paths;
  for (const uint32_t file : index.FilesFor(WordsNeededBy(question))) paths.push_back(index[file].path);
  return paths;
}

std::string SmallIndex() {
  Repository repository;
  repository.Add("shop.py", kShop);
  repository.Add("b/x.py", "def total(items): return items\n");
  repository.Add("b/y.py", "total = 1\nx.total.y\n", -1);
  IndexedFile bad;
  bad.path = "bad.py";
  bad.problem = "no such encoding";
  EXPECT_TRUE(repository.writer.Add(bad, "").has_value());
  return repository.writer.Finish("settings");
}

TEST(Index, HoldsWhatWasPutIn) {
  const std::string bytes = SmallIndex();
  ASSERT_EQ(NameIndex::StateOf(bytes), NameIndex::State::kFine);
  const NameIndex index(bytes);
  EXPECT_EQ(index.settings(), "settings");
  ASSERT_EQ(index.size(), 4u);
  EXPECT_EQ(index[0].path, "b/x.py");
  EXPECT_EQ(index[1].path, "b/y.py");
  EXPECT_EQ(index[1].time, -1);
  EXPECT_EQ(index[1].hash, HashOfBytes("total = 1\nx.total.y\n"));
  EXPECT_EQ(index[2].problem, "no such encoding");
  EXPECT_EQ(index[3].size, kShop.size());
  EXPECT_GT(index[3].records, 10u);
}

TEST(Index, NamesTheFilesThatMayAnswer) {
  const std::string bytes = SmallIndex();
  const NameIndex index(bytes);
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kExact, "LIMIT")), Found{"shop.py"});
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kExact, "total", UseOfKind(RecordKind::kSet))),
            (Found{"b/x.py", "b/y.py"}));
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kExact, "total", UseOfKind(RecordKind::kGet))), Found{"b/y.py"});
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kExact, "x.total.y")), Found{"b/y.py"});
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kGlob, "tot*")), (Found{"b/x.py", "b/y.py"}));
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kGlob, "*MI?")), Found{"shop.py"});
  EXPECT_EQ(PathsFor(index, QuestionFor(Match::kGlob, "*")).size(), 3u);
  Question question = QuestionFor(Match::kExact, "total", 0);
  question.returns = true;
  EXPECT_EQ(PathsFor(index, question), Found{"b/x.py"});
  question = QuestionFor(Match::kExact, "self");
  question.has_scope = true;
  question.scope = "Shop.add";
  EXPECT_EQ(PathsFor(index, question), Found{"shop.py"});
  question.scope = "Shop.nothing";
  EXPECT_EQ(PathsFor(index, question), Found{});
}

TEST(Index, NeverMissesAFileThatAnswers) {
  const std::vector<std::string> sources = {
      std::string(kShop), "from a.b import c as d, e\nprint(d.e(1), *x)\n", "x[a.b] = y = 1\nz: T = x[0].q\n",
      "def f(a, *, b):\n  # type: (int, str) -> bool\n  global g\n  g = a\n  yield b\n",
      "class A(B):\n  x = lambda q: q\n  def f(s): return s.x(s)\n" + std::string(150, 'l') + " = 1\n"};
  Repository repository;
  for (size_t i = 0; i < sources.size(); ++i) repository.Add(std::to_string(i), sources[i]);
  const std::string bytes = repository.writer.Finish("");
  const NameIndex index(bytes);
  size_t answered = 0;
  for (const std::string& name :
       std::vector<std::string>{"x",      "self", "d.e", "a.b",    "g",     "A.f",     "Shop",  "T",   "s.x", "x[a.b]",
                                "x[0].q", "*",    "c",   "return", "items", "os.path", "lllll", "add", "f",   "int"}) {
    for (const Match match : {Match::kExact, Match::kSuffix, Match::kGlob}) {
      for (const std::string& form : {name, "*" + name, name + "*", "?" + name.substr(1), "." + name}) {
        for (const bool returns : {false, true}) {
          for (const Uses uses : {kAllUses, UseOfKind(RecordKind::kSet), UseOfKind(RecordKind::kHint), kParameterUse}) {
            Question question = QuestionFor(match, form, uses);
            question.returns = returns;
            const Found candidates = PathsFor(index, question);
            for (size_t i = 0; i < sources.size(); ++i) {
              if (AnswersIn(sources[i], question).empty()) continue;
              ++answered;
              EXPECT_NE(std::find(candidates.begin(), candidates.end(), std::to_string(i)), candidates.end())
                  << form << " in " << i;
            }
          }
        }
      }
    }
  }
  EXPECT_GT(answered, 500u);
}

TEST(Index, TakesFilesOverAndForgetsWordsThatAreGone) {
  const std::string bytes = SmallIndex();
  const NameIndex index(bytes);
  Repository repository;
  repository.writer.Keep(index, 0, 31, 9);
  repository.writer.Keep(index, 3, kShop.size(), 7);
  const std::string again = repository.writer.Finish("settings");
  const NameIndex kept(again);
  ASSERT_EQ(kept.size(), 2u);
  EXPECT_EQ(kept[0].time, 9);
  EXPECT_EQ(PathsFor(kept, QuestionFor(Match::kExact, "LIMIT")), Found{"shop.py"});
  for (const WordTable::Entry& entry : kept.words()) EXPECT_NE(entry.word, "y");

  Repository fresh;
  fresh.Add("shop.py", kShop);
  fresh.Add("b/x.py", "def total(items): return items\n", 9);
  EXPECT_EQ(fresh.writer.Finish("settings"), again);
}

TEST(Index, IsTheSameWhateverCameBefore) {
  const std::string sources[] = {"zebra = apple = 1\nmango(apple)\n", "kiwi = fig\nzebra = date\n",
                                 "pear.plum = kiwi\n"};
  Repository fresh, first, second;
  for (int i = 0; i < 3; ++i) fresh.Add(std::to_string(i), sources[i]);
  const std::string expected = fresh.writer.Finish("");
  first.Add("2", sources[2]);
  first.Add("0", sources[0]);
  const std::string bytes = first.writer.Finish("");
  const NameIndex before(bytes);
  second.Add("1", sources[1]);
  for (size_t i = 0; i < before.size(); ++i) second.writer.Keep(before, i, before[i].size, before[i].time);
  EXPECT_EQ(second.writer.Finish(""), expected);
}

TEST(Index, ManyUsesAndWordsSurvive) {
  Repository repository;
  std::string source;
  for (int i = 0; i < 300; ++i) {
    const std::string n = "n" + std::to_string(i);
    source += i % 2 ? n + " = 1\n" : n + "(1)\n";
    if (i % 3 == 0) source += n + ": int\n";
    if (i % 5 == 0) source += "import " + n + "\n";
    if (i % 7 == 0) source += "def f(" + n + "): pass\n";
    if (i % 11 == 0) source += "def " + n + "(): pass\n";
    if (i % 13 == 0) source += "from m import " + n + "\n";
  }
  for (int i = 0; i < 40; ++i) repository.Add(std::to_string(i), Text(source).substr(0, source.size() * i / 40));
  const std::string bytes = repository.writer.Finish("");
  const NameIndex index(bytes);
  const auto words = MakeWordsWriter(testing::kPy3);
  const std::string written = Written(*words, Text(source).substr(0, source.size() * 39 / 40));
  FileWords expected;
  ASSERT_TRUE(ReadFileWords(written, expected));
  std::set<std::pair<std::string, Uses>> wanted, found;
  for (const auto& [word, uses] : expected.words) wanted.emplace(word, uses);
  size_t number = 0;
  while (index[number].path != "39") ++number;
  index.ForEachWordOf(number, [&](uint32_t word, Uses uses) { found.emplace(index.words()[word].word, uses); });
  EXPECT_EQ(found, wanted);
}

TEST(Index, DamageIsNoticed) {
  const std::string bytes = SmallIndex();
  for (size_t size = 0; size < bytes.size(); ++size) {
    EXPECT_EQ(NameIndex::StateOf(Text(bytes).substr(0, size)), NameIndex::State::kDamaged) << size;
    test::ExpectError(ErrorKind::kValueError, "the index is damaged", [&] { NameIndex(Text(bytes).substr(0, size)); });
  }
  for (size_t i = 0; i < bytes.size(); ++i) {
    std::string damaged = bytes;
    damaged[i] = static_cast<char>(damaged[i] ^ 4);
    EXPECT_NE(NameIndex::StateOf(damaged), NameIndex::State::kFine) << i;
  }
  EXPECT_EQ(NameIndex::StateOf("import os\n"), NameIndex::State::kForeign);
  EXPECT_NE(NameIndex::StateOf(bytes + "x"), NameIndex::State::kFine);
}

// Bytes with the right checksum may come from anybody.
TEST(Index, PlantedBytesDoNoHarm) {
  const std::string bytes = SmallIndex();
  std::mt19937 chance(3);
  const auto below = [&](size_t limit) { return static_cast<size_t>(chance() % limit); };
  size_t read = 0;
  for (int round = 0; round < 20000; ++round) {
    std::string planted = bytes;
    for (size_t i = below(4) + 1; i-- > 0;) {
      const size_t at = 24 + below(planted.size() - 24);
      switch (below(3)) {
        case 0:
          planted[at] = static_cast<char>(chance());
          break;
        case 1:
          planted.erase(at, below(5));
          break;
        default:
          planted.insert(at, below(5), static_cast<char>(chance()));
      }
      if (planted.size() <= 24) break;
    }
    std::string checksum;
    AppendFixed(HashOfBytes(Text(planted).substr(24)), checksum);
    planted.replace(16, 8, checksum);
    try {
      const NameIndex index(planted);
      ++read;
      Question question = QuestionFor(Match::kGlob, "*t*");
      question.returns = true;
      for (const uint32_t file : index.FilesFor(WordsNeededBy(question)))
        index.ForEachWordOf(file, [&](uint32_t word, Uses) { ASSERT_LT(word, index.words().size()); });
      NameIndexWriter writer;
      for (size_t i = 0; i < index.size(); ++i) writer.Keep(index, i, 0, 0);
      EXPECT_EQ(NameIndex::StateOf(writer.Finish("")), NameIndex::State::kFine);
    } catch (const Error&) {
    }
  }
  EXPECT_GT(read, 100u);
}

// ---- places ----

TEST(Places, AreThoseOfTheFolderAndOfThoseThatAreNamed) {
  Places places("/a/b", {"/c/", "/d"});
  const auto path_of = [&](Text stored) { return places.PathOf(stored).value_or("nowhere"); };
  EXPECT_EQ(path_of("x.py"), "/a/b/x.py");
  EXPECT_EQ(path_of("x/..y/z..py"), "/a/b/x/..y/z..py");
  EXPECT_EQ(path_of("/c/x.py"), "/c/x.py");
  EXPECT_EQ(path_of("/d/./e/../x.py"), "/d/x.py");
  EXPECT_EQ(path_of("/d"), "/d");
  for (const Text stored : {"", "../x.py", "x/../../y.py", "x/..", "..", "/e/x.py", "/cx.py", "/dx", "/c/../e/x.py"})
    EXPECT_EQ(path_of(stored), "nowhere") << stored;
  EXPECT_EQ(path_of(Text("x\0y", 3)), "nowhere");
  EXPECT_EQ(Places("/", {}).PathOf("x.py"), "/x.py");
  EXPECT_EQ(Places("/", {"/"}).PathOf("/x.py"), "/x.py");
}

TEST(Places, LeadNowhereElseByLinks) {
  const testing::TemporaryFolder folder = {
      {"base/x.py", ""}, {"base/in/x.py", ""}, {"other/x.py", ""}, {"named/x.py", ""}};
  folder.Link(folder / "other", "base/away");
  folder.Link(folder / "other/x.py", "base/away.py");
  folder.Link(folder / "base/in", "base/inside");
  folder.Link(folder / "named/x.py", "base/named.py");
  Places places(folder / "base", {folder / "named"});
  for (const char* path : {"base/x.py", "base/in/x.py", "base/inside/x.py", "base/named.py", "named/x.py"})
    EXPECT_TRUE(places.Holds(folder / path)) << path;
  for (const char* path : {"base/away/x.py", "base/away.py", "other/x.py"})
    EXPECT_FALSE(places.Holds(folder / path)) << path;
}

TEST(Counts, AreSumsOverFiles) {
  const auto writer = MakeCountsWriter();
  RecordCounts counts;
  ASSERT_TRUE(counts.Add(Written(*writer, "x = y\nx = z\n")));
  ASSERT_TRUE(counts.Add(Written(*writer, "y.x\n")));
  const auto names = counts.MostUsed(2);
  ASSERT_EQ(names.size(), 2u);
  EXPECT_EQ(names[0].first, "x");
  EXPECT_EQ(names[1].first, "y");
  EXPECT_EQ(counts.kinds()[static_cast<size_t>(RecordKind::kSet)], 2u);
  EXPECT_FALSE(counts.Add("\x80"));
}

TEST(Counts, NameNothingThatIsNoName) {
  const auto writer = MakeCountsWriter();
  RecordCounts counts;
  ASSERT_TRUE(counts.Add(Written(*writer, "from a import *\ndef f():\n  yield a\n  return a\nf()\n")));
  std::vector<std::string> names;
  for (const auto& [name, count] : counts.MostUsed(9)) names.emplace_back(name);
  EXPECT_EQ(names, (std::vector<std::string>{"a", "f"}));
  EXPECT_GT(counts.kinds()[static_cast<size_t>(RecordKind::kFromImport)], 0u);
}

}  // namespace
}  // namespace quillet
