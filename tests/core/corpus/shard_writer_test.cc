// Shards as they are written, read back by a reader of their own that knows of the format what is used here: whole,
// sorted, stable, in groups with true bounds.
#include "corpus/shard_writer.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <map>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "corpus/sorted_run.h"
#include "tests/core/support/analyzer_helper.h"

namespace quillet {
namespace {

using testing::AnalyzerOptions;
using Strings = std::vector<std::string>;

// ---- a reader ----

// A value of Thrift's compact protocol.
struct Value {
  int64_t number = 0;
  std::string binary;
  std::vector<Value> list;
  std::map<int, Value> fields;

  const Value& operator[](int field) const { return fields.at(field); }
  bool Has(int field) const { return fields.count(field) != 0; }
};

class Reader {
 public:
  explicit Reader(Text bytes) : bytes_(bytes) {}

  Value Struct() {
    Value value;
    int field = 0;
    while (const int head = Byte()) {
      field += head >> 4;
      value.fields[field] = Of(head & 15);
    }
    return value;
  }
  uint64_t Varint() {
    uint64_t value = 0;
    for (int shift = 0;; shift += 7) {
      const int byte = Byte();
      value |= static_cast<uint64_t>(byte & 0x7F) << shift;
      if (byte < 0x80) return value;
    }
  }
  int Byte() { return static_cast<unsigned char>(bytes_.at(at_++)); }
  uint32_t Word(size_t width = 4) {
    uint32_t value = 0;
    std::memcpy(&value, Take(width).data(), width);
    return value;
  }
  Text Take(size_t size) {
    EXPECT_LE(at_ + size, bytes_.size());
    at_ += size;
    return bytes_.substr(at_ - size, size);
  }
  bool IsAtEnd() const { return at_ == bytes_.size(); }

 private:
  Value Of(int type) {
    Value value;
    switch (type) {
      case 1:
      case 2:
        value.number = type == 1;
        break;
      case 4:
      case 5:
      case 6: {
        const uint64_t coded = Varint();
        value.number = static_cast<int64_t>(coded >> 1) ^ -static_cast<int64_t>(coded & 1);
        break;
      }
      case 8:
        value.binary = Take(Varint());
        break;
      case 9: {
        const int head = Byte();
        const uint64_t size = head >> 4 == 15 ? Varint() : static_cast<uint64_t>(head >> 4);
        for (uint64_t i = 0; i < size; ++i) value.list.push_back(Of(head & 15));
        break;
      }
      case 12:
        return Struct();
      default:
        ADD_FAILURE() << "a field of type " << type;
    }
    return value;
  }

  Text bytes_;
  size_t at_ = 0;
};

std::vector<uint32_t> Runs(Reader& in, uint32_t bits, size_t count) {
  std::vector<uint32_t> values;
  while (values.size() < count) {
    const uint64_t head = in.Varint();
    if ((head & 1) == 0) {
      const uint32_t value = in.Word((bits + 7) / 8);
      values.insert(values.end(), head >> 1, value);
      continue;
    }
    const Text packed = in.Take((head >> 1) * bits);
    for (size_t i = 0; i < (head >> 1) * 8; ++i) {
      uint32_t value = 0;
      for (uint32_t bit = 0; bit < bits; ++bit) {
        const size_t at = i * bits + bit;
        value |= (static_cast<unsigned char>(packed[at / 8]) >> at % 8 & 1u) << bit;
      }
      values.push_back(value);
    }
  }
  // Only the last eight may be filled up.
  EXPECT_LT(values.size(), count + 8);
  values.resize(count);
  return values;
}

struct File {
  struct Group {
    std::vector<Strings> columns;  // values as text, "-" for none
    std::vector<std::pair<std::string, std::string>> bounds;
  };
  Strings names;
  std::vector<bool> may_be_null;
  std::vector<Group> groups;
  size_t key = 0;
  std::string note;

  std::vector<Strings> Rows() const {
    std::vector<Strings> rows;
    for (const Group& group : groups) {
      for (size_t row = 0; row < group.columns[0].size(); ++row) {
        rows.emplace_back();
        for (const Strings& column : group.columns) rows.back().push_back(column[row]);
      }
    }
    return rows;
  }
  size_t At(const std::string& name) const {
    return static_cast<size_t>(std::find(names.begin(), names.end(), name) - names.begin());
  }
};

// The bytes of a page, whose header goes into `header`.
Text Page(const std::string& bytes, int64_t offset, Value& header, size_t& end) {
  const Text rest = Text(bytes).substr(static_cast<size_t>(offset));
  Reader in(rest);
  header = in.Struct();
  const Text page = in.Take(static_cast<size_t>(header[3].number));
  end = static_cast<size_t>(page.data() + page.size() - bytes.data());
  EXPECT_EQ(header[2].number, header[3].number);  // nothing is compressed here
  return page;
}

Strings ReadChunk(const std::string& bytes, const Value& chunk, bool may_be_null, size_t& end) {
  const int64_t type = chunk[1].number;
  Strings dictionary;
  Value header;
  if (chunk.Has(11)) {
    EXPECT_EQ(static_cast<size_t>(chunk[11].number), end);
    Reader in(Page(bytes, chunk[11].number, header, end));
    EXPECT_EQ(header[1].number, 2);
    while (!in.IsAtEnd())
      dictionary.emplace_back(type == 6 ? std::string(in.Take(in.Word()))
                                        : std::to_string(static_cast<int32_t>(in.Word())));
    EXPECT_EQ(header[7][1].number, static_cast<int64_t>(dictionary.size()));
    EXPECT_EQ(std::set<std::string>(dictionary.begin(), dictionary.end()).size(), dictionary.size());
  }
  EXPECT_EQ(static_cast<size_t>(chunk[9].number), end);
  Reader in(Page(bytes, chunk[9].number, header, end));
  EXPECT_EQ(header[1].number, 0);
  const auto count = static_cast<size_t>(chunk[5].number);
  EXPECT_EQ(header[5][1].number, chunk[5].number);
  std::vector<uint32_t> is_there(count, 1);
  if (may_be_null) {
    Reader levels(in.Take(in.Word()));
    is_there = Runs(levels, 1, count);
    EXPECT_TRUE(levels.IsAtEnd());
  }
  const auto values = static_cast<size_t>(std::count(is_there.begin(), is_there.end(), 1));
  EXPECT_EQ(chunk[12][3].number, static_cast<int64_t>(count - values));
  Strings given;
  if (!dictionary.empty() || type == 6) {
    const auto bits = static_cast<uint32_t>(in.Byte());
    for (const uint32_t place : Runs(in, bits, values)) given.push_back(dictionary.at(place));
  } else if (type == 0) {
    const Text packed = in.Take((count + 7) / 8);
    for (size_t i = 0; i < count; ++i)
      given.emplace_back((static_cast<unsigned char>(packed[i / 8]) >> i % 8 & 1) != 0 ? "yes" : "no");
  } else {
    for (size_t i = 0; i < values; ++i) {
      int64_t value = 0;
      if (type == 1)
        value = static_cast<int32_t>(in.Word());
      else
        std::memcpy(&value, in.Take(8).data(), 8);
      given.push_back(std::to_string(value));
    }
  }
  EXPECT_TRUE(in.IsAtEnd());
  Strings shown;
  size_t next = 0;
  for (const uint32_t is : is_there) shown.push_back(is != 0 ? given.at(next++) : "-");
  return shown;
}

File Read(const std::string& bytes) {
  EXPECT_TRUE(bytes.starts_with("PAR1"));
  EXPECT_TRUE(bytes.ends_with("PAR1"));
  uint32_t length = 0;
  std::memcpy(&length, bytes.data() + bytes.size() - 8, 4);
  Reader in(Text(bytes).substr(bytes.size() - 8 - length, length));
  const Value footer = in.Struct();
  EXPECT_TRUE(in.IsAtEnd());
  File file;
  for (const Value& column : footer[2].list) {
    if (column.Has(5)) continue;
    file.names.push_back(column[4].binary);
    file.may_be_null.push_back(column[3].number == 1);
  }
  EXPECT_EQ(footer[2].list[0][5].number, static_cast<int64_t>(file.names.size()));
  size_t rows = 0;
  size_t end = 4;
  for (const Value& group : footer[4].list) {
    File::Group& read = file.groups.emplace_back();
    file.key = static_cast<size_t>(group[4].list.at(0)[1].number);
    rows += static_cast<size_t>(group[3].number);
    EXPECT_EQ(static_cast<size_t>(group[5].number), end);
    const size_t begin = end;
    for (size_t i = 0; i < file.names.size(); ++i) {
      const Value& chunk = group[1].list.at(i)[3];
      EXPECT_EQ(chunk[3].list.at(0).binary, file.names[i]);
      const size_t chunk_begin = end;
      read.columns.push_back(ReadChunk(bytes, chunk, file.may_be_null[i], end));
      EXPECT_EQ(read.columns.back().size(), static_cast<size_t>(group[3].number));
      EXPECT_EQ(chunk[7].number, static_cast<int64_t>(end - chunk_begin));
      const Value& statistics = chunk[12];
      read.bounds.emplace_back(statistics.Has(6) ? statistics[6].binary : "",
                               statistics.Has(5) ? statistics[5].binary : "");
    }
    EXPECT_EQ(group[6].number, static_cast<int64_t>(end - begin));
  }
  EXPECT_EQ(footer[3].number, static_cast<int64_t>(rows));
  EXPECT_EQ(end, bytes.size() - 8 - length);
  file.note = footer[5].list.at(0)[1].binary + "=" + footer[5].list.at(0)[2].binary;
  return file;
}

// ---- shards ----

void Copy(Text bytes, std::string& compressed) { compressed = bytes; }

ShardWriter::Options Options(size_t run_rows, size_t group_rows, RowForm form = RowForm::kRecords) {
  ShardWriter::Options options;
  options.form = form;
  FileAnalyzer::Options& reading = options.versions.emplace_back();
  static_cast<CPGenAnalyzerImpl::Options&>(reading) = AnalyzerOptions(Version::Of(3, 12));
  options.compress = Copy;
  options.run_rows = run_rows;
  options.group_rows = group_rows;
  return options;
}

struct Shard {
  File rows, files;
  ShardWriter::Totals totals;
};

Shard ShardOf(ShardWriter::Options options, const std::vector<ShardWriter::Source>& sources) {
  ShardWriter writer(std::move(options));
  std::string rows, files, taken;
  const auto take = [&] {
    writer.TakeRows(taken);
    rows += taken;
    writer.TakeFiles(taken);
    files += taken;
  };
  for (const ShardWriter::Source& source : sources) {
    if (writer.Add(source)) writer.Work();
    take();
  }
  writer.WorkToTheEnd();
  writer.Finish("a", "b");
  take();
  return {Read(rows), Read(files), writer.totals()};
}

ShardWriter::Source SourceOf(Text path, Text content) { return {"p", "p-1.tar.gz", path, content, false, {}}; }

TEST(ShardWriter, RowsAreSortedByNameAndThenAsTheyCame) {
  std::string first;
  for (int i = 0; i < 500; ++i) first += "n" + std::to_string(i * 7 % 50) + " = x.y\n";
  const std::string second = "def z(a, b: int):\n    global q\n    return a\n" + first;
  for (const size_t run_rows : {size_t{40}, size_t{1000}, size_t{100'000}}) {
    const Shard shard = ShardOf(Options(run_rows, 64), {SourceOf("b.py", first), SourceOf("a.py", second)});
    const size_t name = shard.rows.At("name");
    EXPECT_EQ(shard.rows.key, name);
    EXPECT_EQ(shard.rows.note, "a=b");
    const std::vector<Strings> rows = shard.rows.Rows();
    EXPECT_EQ(rows.size(), shard.totals.rows);
    EXPECT_GT(rows.size(), 1500u);
    size_t falls = 0;
    for (size_t i = 1; i < rows.size(); ++i) {
      falls += rows[i][name] < rows[i - 1][name];
      if (rows[i][name] != rows[i - 1][name] || rows[i][2] != rows[i - 1][2]) continue;
      EXPECT_GE(std::stoi(rows[i][shard.rows.At("line")]), std::stoi(rows[i - 1][shard.rows.At("line")]));
    }
    EXPECT_LE(falls, rows.size() / run_rows);
    for (const File::Group& group : shard.rows.groups) {
      EXPECT_LE(group.columns[0].size(), 64u);
      const Strings& names = group.columns[name];
      EXPECT_EQ(group.bounds[name], std::pair(*std::min_element(names.begin(), names.end()),
                                              *std::max_element(names.begin(), names.end())));
      EXPECT_EQ(group.bounds[0], std::pair(std::string(), std::string()));
    }
  }
}

TEST(ShardWriter, AllRunLengthsSayTheSameRows) {
  const std::string source = "import os\nclass C:\n    def f(self, a: int = 1):\n        self.x = os.path.join(a)\n";
  std::vector<Strings> expected;
  for (const size_t rows : {size_t{1}, size_t{3}, size_t{10'000}}) {
    for (const size_t group : {size_t{1}, size_t{7}, size_t{10'000}}) {
      std::vector<Strings> found =
          ShardOf(Options(rows, group), {SourceOf("a.py", source), SourceOf("b.py", "def f(:\n")}).rows.Rows();
      std::sort(found.begin(), found.end());
      if (expected.empty()) expected = found;
      EXPECT_EQ(found, expected);
    }
  }
  ASSERT_GT(expected.size(), 10u);
  EXPECT_NE(
      std::find(expected.begin(), expected.end(),
                Strings({"p", "p-1.tar.gz", "a.py", "4", "18", "C.f", "os.path.join", "called", "(a)", "no", "-"})),
      expected.end());
}

TEST(ShardWriter, SourcesWithoutContentAreRowsOfBothFiles) {
  ShardWriter::Source gone = SourceOf("gone.py", {});
  gone.content.reset();
  gone.problem = "it is gone";
  ShardWriter::Source text = SourceOf("text.py", "# coding: latin-1\nx = '\xC3\xA9'\n");
  text.is_text = true;
  const Shard shard = ShardOf(Options(100, 100), {SourceOf("a.py", "x = 1\n"), text, gone, SourceOf("b.py", "")});
  const std::vector<Strings> files = shard.files.Rows();
  ASSERT_EQ(files.size(), 4u);
  Strings paths;
  for (const Strings& row : files) paths.push_back(row[2]);
  EXPECT_EQ(paths, (Strings{"a.py", "b.py", "gone.py", "text.py"}));
  EXPECT_EQ(files[2], (Strings{"p", "p-1.tar.gz", "gone.py", "3.12", "0", "0", "0", "0", "it is gone"}));
  EXPECT_EQ(files[3].back(), "-");
  EXPECT_EQ(shard.rows.Rows()[0].back(), "it is gone");
  EXPECT_EQ(shard.totals.files, 4u);
  EXPECT_EQ(shard.totals.problems, 1u);
}

TEST(ShardWriter, OccurrencesHaveFlagsAndMissingNumbers) {
  const Shard shard = ShardOf(Options(5, 3, RowForm::kOccurrences),
                              {SourceOf("a.py", "import os\ndef f(a):\n    return os.path(a)\n")});
  const File& file = shard.rows;
  EXPECT_EQ(file.key, file.At("text"));
  std::set<std::string> texts, receivers;
  for (const Strings& row : file.Rows()) {
    texts.insert(row[file.At("text")]);
    receivers.insert(row[file.At("receiver")]);
  }
  EXPECT_EQ(texts, (std::set<std::string>{"a", "f", "os", "path"}));
  EXPECT_TRUE(receivers.count("-") != 0 && receivers.size() > 1);
}

TEST(ShardWriter, NothingIsAFileWithoutRows) {
  const Shard shard = ShardOf(Options(5, 3), {});
  EXPECT_TRUE(shard.rows.groups.empty());
  EXPECT_EQ(shard.rows.names.size(), 11u);
  EXPECT_EQ(shard.files.names.back(), "problem");
}

// ---- the file itself ----

std::string TakenFrom(ParquetFile& file) {
  std::string taken;
  file.TakeBytes(taken);
  return taken;
}

std::string DictionaryOf(const Strings& texts) {
  std::string page;
  for (const std::string& text : texts) {
    const auto length = static_cast<uint32_t>(text.size());
    page.append(reinterpret_cast<const char*>(&length), 4) += text;
  }
  return page;
}

TEST(ParquetFile, HoldsWhatIsWrittenWhateverItsRuns) {
  std::mt19937 chance(7);
  const auto below = [&chance](size_t bound) { return static_cast<size_t>(chance() % bound); };
  for (int round = 0; round < 300; ++round) {
    ParquetFile file({{"t", "u", {}, true}, {"i", "i", {}, true}, {"l", "l", {}}, {"b", "b", {}}}, 0, Copy);
    std::vector<Strings> expected;
    const size_t groups = below(4);
    for (size_t group = 0; group < groups; ++group) {
      const size_t size = 1 + below(400);
      // Now and then more texts than a byte can tell apart.
      Strings owned;
      for (size_t i = 0; i < (round % 5 == 0 ? 300 : 1 + below(9)); ++i) owned.push_back("text" + std::to_string(i));
      const std::string dictionary = DictionaryOf(owned);
      const size_t sameness = 1 + below(40);
      std::vector<uint32_t> places;
      std::vector<int32_t> numbers;
      std::vector<int64_t> long_numbers;
      Bits bits, validity;
      for (size_t i = 0; i < size; ++i) {
        const bool is_there = round % 2 == 0 || below(sameness) != 0;
        validity.Add(is_there);
        const auto place =
            static_cast<uint32_t>(below(sameness) != 0 && !places.empty() ? places.back() : below(owned.size()));
        if (is_there) {
          places.push_back(place);
          numbers.push_back(round % 3 == 0 ? static_cast<int32_t>(chance())
                                           : static_cast<int32_t>(below(50)) - round % 3 + 1);
        }
        long_numbers.push_back(static_cast<int64_t>(chance()) << 20);
        bits.Add(below(2) != 0);
        expected.push_back({is_there ? owned[place] : "-", is_there ? std::to_string(numbers.back()) : "-",
                            std::to_string(long_numbers.back()), bits[i] ? "yes" : "no"});
      }
      ParquetColumn texts, ints, longs, truths;
      texts.places = places;
      texts.dictionary = dictionary;
      texts.dictionary_size = owned.size();
      texts.bounds = {"text0", "text9"};
      ints.numbers = numbers;
      longs.long_numbers = long_numbers;
      truths.bits = &bits;
      texts.validity = ints.validity = &validity;
      file.WriteGroup(size, std::vector<ParquetColumn>{texts, ints, longs, truths});
    }
    file.Finish("round", std::to_string(round));
    const File read = Read(TakenFrom(file));
    EXPECT_EQ(read.Rows(), expected) << round;
    EXPECT_EQ(read.groups.size(), groups);
  }
}

TEST(ParquetFile, LongTextsAreNoBounds) {
  ParquetFile file({{"t", "u", {}}}, 0, Copy);
  const std::string text(ParquetFile::kLongestBound + 1, 'x');
  const std::string dictionary = DictionaryOf({"a", text});
  const std::vector<uint32_t> places = {0, 1};
  ParquetColumn column;
  column.places = places;
  column.dictionary = dictionary;
  column.dictionary_size = 2;
  column.bounds = {"a", text};
  file.WriteGroup(2, std::vector<ParquetColumn>{column});
  file.Finish("", "");
  const File read = Read(TakenFrom(file));
  EXPECT_EQ(read.groups[0].bounds[0], std::pair(std::string(), std::string()));
  EXPECT_EQ(read.Rows()[1][0], text);
}

}  // namespace
}  // namespace quillet
