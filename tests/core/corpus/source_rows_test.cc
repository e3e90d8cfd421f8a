// Sources in record batches of every layout, and the rows that come out: of names, of what is wrong, and of nothing
// where a table is full in the middle of a source.
#include "corpus/source_rows.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "foundations/errors.h"
#include "tests/core/corpus/columns_of_input.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

using testing::AnalyzerOptions;
using testing::BatchOf;
using testing::InputTable;
using Strings = std::vector<std::string>;
using Texts = InputTable::Texts;

FileAnalyzer::Options Reading(Version version) {
  FileAnalyzer::Options options;
  static_cast<CPGenAnalyzerImpl::Options&>(options) = AnalyzerOptions(version);
  return options;
}

SourceRows::Options Options(RowForm form = RowForm::kRecords, std::vector<Version> versions = {Version::Of(3, 12)}) {
  SourceRows::Options options;
  options.form = form;
  for (const Version version : versions) options.versions.push_back(Reading(version));
  options.path_column = "path";
  options.content_column = "content";
  return options;
}

std::shared_ptr<InputTable> Table(const Texts& contents, const std::string& layout = "z") {
  Texts paths;
  for (size_t i = 0; i < contents.size(); ++i) paths.push_back(std::to_string(i) + ".py");
  auto table = std::make_shared<InputTable>();
  table->Add("path", "u", paths).Add("content", layout, contents);
  return table;
}

// The value of a row's column, as text; "-" for none.
std::string Shown(const Column& column, const ColumnBuffers& buffers, size_t row, bool is_numbered) {
  if (buffers.validity != nullptr && !(*buffers.validity)[row]) return "-";
  const auto text_at = [](const auto* offsets, const void* bytes, size_t i) {
    return std::string(static_cast<const char*>(bytes) + offsets[i], static_cast<size_t>(offsets[i + 1] - offsets[i]));
  };
  const void* values = buffers.values[0];
  switch (column.format[0]) {
    case 'i':
      return std::to_string(static_cast<const int32_t*>(values)[row]);
    case 'l':
      return std::to_string(static_cast<const int64_t*>(values)[row]);
    case 'b':
      return (static_cast<const uint8_t*>(values)[row / 8] >> row % 8 & 1) != 0 ? "yes" : "no";
    default:
      if (is_numbered) {
        const uint32_t number = static_cast<const uint32_t*>(values)[row];
        return std::string(static_cast<const ColumnTexts*>(buffers.values[1])->TextOf(number));
      }
      return text_at(static_cast<const int32_t*>(values), buffers.values[1], row);
  }
}

void Append(const RowTable* table, Strings& rows, bool is_numbered = false) {
  if (table == nullptr) return;
  const std::vector<Column> schema = table->Schema();
  const std::vector<ColumnBuffers> buffers = table->Buffers();
  for (size_t row = 0; row < table->size(); ++row) {
    std::string shown;
    for (size_t i = 0; i < schema.size(); ++i) {
      if (i > 0) shown += '|';
      shown += Shown(schema[i], buffers[i], row, is_numbered);
    }
    rows.push_back(shown);
  }
}

Strings RowsOf(SourceRows& rows, const std::vector<std::shared_ptr<InputTable>>& tables, bool is_numbered = false) {
  Strings shown;
  for (const auto& table : tables) {
    rows.Begin(BatchOf(table));
    while (const auto next = rows.Next()) Append(next.get(), shown, is_numbered);
  }
  Append(rows.Finish().get(), shown, is_numbered);
  return shown;
}

Strings RowsOf(SourceRows::Options options, const std::shared_ptr<InputTable>& table) {
  const bool is_numbered = options.numbered_rows != 0;
  SourceRows rows(std::move(options));
  return RowsOf(rows, {table}, is_numbered);
}

std::string MessageOf(const std::function<void()>& call) {
  try {
    call();
  } catch (const Error& error) {
    return error.message();
  }
  return "nothing was thrown";
}

TEST(SourceRows, ReadsEveryLayout) {
  const Texts contents = {"x\n", std::nullopt, "", "def function_of_name(first, second):\n    return first\n"};
  const Strings expected = RowsOf(Options(), Table(contents));
  ASSERT_EQ(expected.size(), 7u);
  EXPECT_EQ(expected[0], "0.py|1|1||x|get||no|-");
  EXPECT_EQ(expected[1], "1.py|1|1|||problem||no|there is no source");
  for (const char* layout : {"u", "Z", "U", "vz", "vu", "di"})
    EXPECT_EQ(RowsOf(Options(), Table(contents, layout)), expected) << layout;
}

TEST(SourceRows, CarriesColumnsAlong) {
  auto table = Table({"a\nb\n", "def f(:\n"});
  table->Add("package", "di", {"p", std::nullopt}).AddNumbers("stars", {7, -8});
  SourceRows::Options options = Options();
  options.kept_columns = {"stars", "package"};
  const Strings rows = RowsOf(options, table);
  ASSERT_EQ(rows.size(), 3u);
  EXPECT_EQ(rows[0], "7|p|0.py|1|1||a|get||no|-");
  EXPECT_EQ(rows[1], "7|p|0.py|2|1||b|get||no|-");
  EXPECT_EQ(rows[2].substr(0, 9), "-8|-|1.py");
}

TEST(SourceRows, DecidesForTheVersionWithTheFewestErrors) {
  const auto table = Table({"print 'x'\n", "async = 1\n", "match x:\n    case 1: pass\n", "#!/usr/bin/python2\nx = 1\n",
                            "#!/usr/bin/python2\nprint('x', file=y)\n", "def f(:\n"});
  const std::vector<Version> versions = {Version::Of(3, 13), Version::Of(3, 6), Version::Of(2, 7)};
  const Strings rows = RowsOf(Options(RowForm::kFiles, versions), table);
  Strings pythons;
  for (const std::string& row : rows) pythons.push_back(row.substr(5, row.find('|', 5) - 5));
  EXPECT_EQ(pythons, (Strings{"2.7", "3.6", "3.13", "2.7", "3.13", "3.13"}));
}

TEST(SourceRows, FullTablesAreHandedOutInTheMiddleOfASource) {
  std::string source;
  for (int i = 0; i < 70'000; ++i) source += "x\n";
  SourceRows rows(Options());
  rows.Begin(BatchOf(Table({source, "y\n"})));
  const auto first = rows.Next();
  ASSERT_NE(first, nullptr);
  EXPECT_GE(first->size(), RowTable::kMostRows);
  EXPECT_LT(first->size(), RowTable::kMostRows + 100);
  EXPECT_EQ(rows.Next(), nullptr);
  Strings all;
  Append(first.get(), all);
  Append(rows.Finish().get(), all);
  ASSERT_EQ(all.size(), 70'001u);
  EXPECT_EQ(all[69'999], "0.py|70000|1||x|get||no|-");
  EXPECT_EQ(all[70'000], "1.py|1|1||y|get||no|-");
}

TEST(SourceRows, NumberedTablesSayTheSame) {
  std::string source;
  for (int i = 0; i < 300; ++i) source += "name_" + std::to_string(i % 7) + " = other(" + std::to_string(i) + ")\n";
  const auto table = Table({source, "def f(:\n", std::nullopt, source + "\nx = 'é'\n"});
  for (const RowForm form : {RowForm::kRecords, RowForm::kOccurrences, RowForm::kFiles}) {
    SourceRows::Options numbered = Options(form);
    numbered.numbered_rows = 100;
    const Strings expected = RowsOf(Options(form), table);
    EXPECT_EQ(RowsOf(numbered, table), expected);
    EXPECT_GE(expected.size(), 4u);
  }
}

TEST(SourceRows, CountsWhatItSaw) {
  auto table = Table({"x\n", std::nullopt, "def f(:\n"});
  table->Add("why", "u", {std::nullopt, "it is gone", std::nullopt});
  SourceRows::Options options = Options();
  options.problem_column = "why";
  SourceRows rows(options);
  const Strings shown = RowsOf(rows, {table});
  EXPECT_EQ(shown[1], "1.py|1|1|||problem||no|it is gone");
  EXPECT_EQ(rows.totals().files, 3u);
  EXPECT_EQ(rows.totals().lines, 2u);
  EXPECT_EQ(rows.totals().errors, 1u);
  EXPECT_EQ(rows.totals().problems, 1u);
  Strings files;
  Append(rows.TakeFiles().get(), files);
  ASSERT_EQ(files.size(), 3u);
  EXPECT_EQ(files[1], "1.py|3.12|0|0|0|0|it is gone");
  EXPECT_EQ(rows.TakeFiles(), nullptr);
}

TEST(SourceRows, SaysWhereASourceWasNotReadWhole) {
  std::string many = "x = [";
  for (int i = 0; i < 200'000; ++i) many += "a,";
  const Strings rows = RowsOf(Options(), Table({many + "]\n", "y\n"}));
  EXPECT_EQ(rows.back(), "1.py|1|1||y|get||no|-");
  EXPECT_EQ(
      std::ranges::count_if(rows, [](const std::string& row) { return row.find("|report|") != std::string::npos; }), 1);
}

TEST(SourceRows, CarriesValuesOfEveryFixedSize) {
  const std::pair<const char*, size_t> layouts[] = {
      {"c", 1},    {"C", 1},   {"s", 2},      {"S", 2},        {"e", 2},          {"i", 4},   {"I", 4},
      {"f", 4},    {"l", 8},   {"L", 8},      {"g", 8},        {"w:3", 3},        {"tdD", 4}, {"tts", 4},
      {"ttm", 4},  {"tiM", 4}, {"tdm", 8},    {"ttu", 8},      {"ttn", 8},        {"tiD", 8}, {"tin", 16},
      {"tsu:", 8}, {"tDs", 8}, {"d:5,2", 16}, {"d:5,2,64", 8}, {"d:5,2,256", 32},
  };
  for (const auto& [layout, width] : layouts) {
    std::string first, second;
    for (size_t i = 0; i < width; ++i) {
      first += static_cast<char>('a' + i);
      second += static_cast<char>('A' + i);
    }
    auto table = Table({"x\n", "y\n"});
    table->AddFixed("kept", layout, {first, second});
    SourceRows::Options options = Options();
    options.kept_columns = {"kept"};
    SourceRows rows(std::move(options));
    rows.Begin(BatchOf(table));
    ASSERT_EQ(rows.Next(), nullptr) << layout;
    const auto made = rows.Finish();
    ASSERT_EQ(made->size(), 2u) << layout;
    EXPECT_EQ(made->Schema()[0].format, layout);
    const std::vector<ColumnBuffers> buffers = made->Buffers();
    EXPECT_EQ(std::string(static_cast<const char*>(buffers[0].values[0]), 2 * width), first + second) << layout;
  }
}

TEST(SourceRows, RefusesColumnsThatDoNotFit) {
  SourceRows rows(Options());
  auto numbers = std::make_shared<InputTable>();
  numbers->Add("path", "u", {"a.py"}).AddNumbers("content", {1});
  EXPECT_EQ(MessageOf([&] { rows.Begin(BatchOf(numbers)); }), "column 'content' must hold strings or bytes");
  auto missing = std::make_shared<InputTable>();
  missing->Add("name", "u", {"a.py"}).Add("content", "z", {"x"});
  EXPECT_EQ(MessageOf([&] { rows.Begin(BatchOf(missing)); }), "there is no column 'path'; there are: name, content");
  SourceRows::Options keeps_line = Options();
  keeps_line.kept_columns = {"line"};
  SourceRows clashing(keeps_line);
  auto lines = Table({"x"});
  lines->AddNumbers("line", {1});
  EXPECT_EQ(MessageOf([&] { clashing.Begin(BatchOf(lines)); }),
            "column 'line' cannot be kept: there is one of that name");
  SourceRows::Options keeps = Options();
  keeps.kept_columns = {"more"};
  SourceRows changing(keeps);
  auto one = Table({"x"});
  one->AddNumbers("more", {1});
  auto other = Table({"x"});
  other->Add("more", "u", {"1"});
  EXPECT_EQ(MessageOf([&] {
              RowsOf(changing, {one, other});
            }),
            "column 'more' has another type than in the batches before");
}

}  // namespace
}  // namespace quillet
