// Pages of a database read back by a reader of its format: what was added is there, in its order, in trees of every
// height, and no page is more than full.
#include "output/database_pages.h"

#include <gtest/gtest.h>

#include <array>
#include <string>
#include <utility>
#include <vector>

#include "foundations/errors.h"

namespace quillet {
namespace {

using Kind = DatabaseTree::Kind;
using Values = std::vector<uint64_t>;

// The head of a database of three pages.
std::string Head(uint32_t page_size) {
  std::string head(DatabasePages::kHeadSize, '\0');
  head.replace(0, 15, "SQLite format 3");
  head[16] = static_cast<char>(page_size >> 8);
  head[17] = static_cast<char>(page_size == 65536 ? 1 : page_size);
  head[31] = 3;
  head[47] = 4;
  return head;
}

class Reader {
 public:
  Reader(const DatabasePages& pages, std::string bytes) : page_size_(pages.page_size()), bytes_(std::move(bytes)) {}

  // The rows or keys below a page, each with the id of the row in front where it is a table.
  std::vector<Values> Read(const std::string& page) {
    std::vector<Values> found;
    Add(page, found, 0);
    return found;
  }
  size_t height() const { return height_; }

 private:
  static uint64_t Number(const std::string& bytes, size_t at, size_t size) {
    uint64_t value = 0;
    for (size_t i = 0; i < size; ++i) value = value << 8 | static_cast<unsigned char>(bytes.at(at + i));
    return value;
  }
  static uint64_t Varint(const std::string& bytes, size_t& at) {
    uint64_t value = 0;
    for (int i = 0; i < 8; ++i) {
      const auto byte = static_cast<unsigned char>(bytes.at(at++));
      value = value << 7 | (byte & 0x7F);
      if (byte < 0x80) return value;
    }
    return value << 8 | static_cast<unsigned char>(bytes.at(at++));
  }

  // The values of a record that ends with its last one; a null is left out.
  static void AddValues(const std::string& page, size_t at, uint64_t size, Values& values) {
    constexpr std::array<size_t, 10> kSizes = {0, 1, 2, 3, 4, 6, 8, 8, 0, 0};
    const size_t end = at + size;
    size_t type_at = at;
    size_t value_at = at + Varint(page, type_at);
    for (const size_t types_end = value_at; type_at < types_end;) {
      const uint64_t type = Varint(page, type_at);
      ASSERT_LT(type, kSizes.size());
      if (type == 0) continue;
      values.push_back(type >= 8 ? type - 8 : Number(page, value_at, kSizes[type]));
      // A number with its top bit set would be read as a negative one.
      if (type < 8) {
        EXPECT_EQ(values.back() >> (8 * kSizes[type] - 1), 0u);
      }
      value_at += kSizes[type];
    }
    EXPECT_EQ(value_at, end);
  }

  void Add(const std::string& page, std::vector<Values>& found, size_t depth) {
    height_ = std::max(height_, depth + 1);
    ASSERT_EQ(page.size(), page_size_);
    const auto kind = static_cast<unsigned char>(page[0]);
    const bool is_leaf = (kind & 8) != 0, is_table = (kind & 7) == 5;
    EXPECT_TRUE(is_table || (kind & 7) == 2);
    const size_t count = Number(page, 3, 2), head = is_leaf ? 8 : 12;
    const size_t begin = Number(page, 5, 2) == 0 ? 65536 : Number(page, 5, 2);
    EXPECT_LE(head + 2 * count, begin);
    size_t size_of_cells = 0;
    for (size_t i = 0; i < count; ++i) {
      const size_t cell = Number(page, head + 2 * i, 2);
      EXPECT_GE(cell, begin);
      size_t at = cell;
      if (!is_leaf) {
        Add(PageAt(Number(page, at, 4)), found, depth + 1);
        at += 4;
      }
      if (is_table && !is_leaf) {
        EXPECT_EQ(Varint(page, at), found.back().front()) << "the last row below";
      } else {
        const uint64_t size = Varint(page, at);
        Values values;
        if (is_table) values.push_back(Varint(page, at));
        AddValues(page, at, size, values);
        found.push_back(std::move(values));
        at += size;
      }
      size_of_cells += at - cell;
    }
    EXPECT_EQ(begin + size_of_cells, page_size_) << "nothing between the cells";
    if (!is_leaf) {
      EXPECT_GT(count, 0u);
      Add(PageAt(Number(page, 8, 4)), found, depth + 1);
    }
  }
  // Those of the database itself, 1 to 3, are nobody's.
  std::string PageAt(uint64_t number) const {
    EXPECT_GT(number, 3u);
    return bytes_.substr((number - 4) * page_size_, page_size_);
  }

  size_t page_size_;
  std::string bytes_;
  size_t height_ = 0;
};

TEST(DatabaseTrees, HoldNumbersOfEverySize) {
  DatabasePages pages(Head(4096));
  DatabaseTree table(Kind::kTable, pages), index(Kind::kIndex, pages);
  const std::vector<uint32_t> numbers = {0,      1,         2,         0x7F,        0x80,        0x7FFF,
                                         0x8000, 0x7F'FFFF, 0x80'0000, 0x7FFF'FFFF, 0x8000'0000, 0xFFFF'FFFF};
  const Values ids = {
      0, 1, 127, 128, 16383, 16384, (uint64_t{1} << 40) - 1, uint64_t{1} << 47, DatabaseTree::kIdLimit - 1};
  std::vector<Values> rows, keys;
  size_t at = 0;
  for (const uint64_t id : ids) {
    const std::array columns = {numbers[at], numbers[at + 1], numbers[at + 2]};
    at = (at + 3) % numbers.size();
    table.Add(id, columns);
    index.Add(id, columns);
    rows.push_back({id, columns[0], columns[1], columns[2]});
    keys.push_back({columns[0], columns[1], columns[2], id});
  }
  const std::string table_root = table.Finish(), index_root = index.Finish();
  Reader reader(pages, pages.Take());
  EXPECT_EQ(reader.Read(table_root), rows);
  EXPECT_EQ(reader.Read(index_root), keys);
  EXPECT_EQ(reader.height(), 1u);
}

TEST(DatabaseTrees, HoldAnyNumberOfRows) {
  for (const uint32_t page_size : {512u, 4096u, 65536u}) {
    for (const size_t count : {0u, 1u, 30u, 60u, 61u, 100u, 2000u, 9000u}) {
      DatabasePages pages(Head(page_size));
      DatabaseTree table(Kind::kTable, pages), index(Kind::kIndex, pages);
      std::vector<Values> rows, keys;
      for (uint32_t i = 0; i < count; ++i) {
        const std::array columns = {i, i * 7919u};
        table.Add(3 * i + 5, columns);
        index.Add(i, columns);
        rows.push_back({3 * i + 5, i, i * 7919u});
        keys.push_back({i, i * 7919u, i});
      }
      const std::string table_root = table.Finish(), index_root = index.Finish();
      const std::string bytes = pages.Take();
      EXPECT_EQ(bytes.size(), size_t{page_size} * (pages.page_count() - 3));
      Reader of_table(pages, bytes), of_index(pages, bytes);
      EXPECT_EQ(of_table.Read(table_root), rows) << page_size << " " << count;
      EXPECT_EQ(of_index.Read(index_root), keys) << page_size << " " << count;
      if (page_size == 512 && count == 9000) {
        EXPECT_GE(of_table.height(), 3u);
      }
    }
  }
}

TEST(DatabaseTrees, RefuseWhatCannotBeTheNext) {
  DatabasePages pages(Head(1024));
  DatabaseTree table(Kind::kTable, pages), index(Kind::kIndex, pages);
  const std::array<uint32_t, DatabaseTree::kMostColumns + 1> columns = {};
  EXPECT_THROW(table.Add(DatabaseTree::kIdLimit, std::span(columns).first(1)), Error);
  EXPECT_THROW(table.Add(1, columns), Error);
  table.Add(7, std::span(columns).first(DatabaseTree::kMostColumns));
  EXPECT_THROW(table.Add(7, std::span(columns).first(1)), Error);
  EXPECT_THROW(table.Add(6, std::span(columns).first(1)), Error);
  index.Add(7, std::span(columns).first(1));
  index.Add(6, std::span(columns).first(1));
  (void)table.Finish();
  EXPECT_THROW(table.Add(8, std::span(columns).first(1)), Error);
  EXPECT_THROW(table.Finish(), Error);
}

TEST(DatabasePages, AreAppendedToDatabasesOfTheKnownFormAlone) {
  EXPECT_EQ(DatabasePages(Head(65536)).page_size(), 65536u);
  EXPECT_EQ(DatabasePages(Head(512)).page_count(), 3u);
  const std::string head = Head(4096);
  const auto with = [&](size_t at, char byte) {
    std::string changed = head;
    changed[at] = byte;
    return changed;
  };
  EXPECT_THROW(DatabasePages(Text(head).substr(1)), Error);
  EXPECT_THROW(DatabasePages(with(3, 'x')), Error);
  EXPECT_THROW(DatabasePages(with(20, 8)), Error) << "bytes of each page are another's";
  EXPECT_THROW(DatabasePages(with(31, 0)), Error) << "no pages";
  EXPECT_THROW(DatabasePages(with(47, 3)), Error) << "another format";
  EXPECT_THROW(DatabasePages(Head(256)), Error);
}

TEST(DatabasePages, LeaveThePageOfTheLocksToNobody) {
  std::string head = Head(65536);
  // As many pages as end where the locks are taken.
  head[30] = static_cast<char>(((1 << 30) / 65536) >> 8);
  head[31] = 0;
  DatabasePages pages(head);
  EXPECT_EQ(pages.page_count(), 16384u);
  EXPECT_EQ(pages.Append(std::string(65536, 'a')), 16386u);
  EXPECT_EQ(pages.Append(std::string(65536, 'b')), 16387u);
  const std::string bytes = pages.Take();
  EXPECT_EQ(bytes, std::string(65536, '\0') + std::string(65536, 'a') + std::string(65536, 'b'));
  EXPECT_EQ(pages.Take(), "");
}

}  // namespace
}  // namespace quillet
