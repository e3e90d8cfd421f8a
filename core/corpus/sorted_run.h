// Rows in the order of one of their columns, as row groups of a Parquet file.
//
// Equal ones stay in the order in which they came. A table with numbered texts is what this takes: the texts of the
// column are ranked, each once, and the rows counted into their places; each group gets dictionaries of what it holds.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "corpus/parquet_file.h"
#include "corpus/row_tables.h"

namespace quillet {

class SortedRun {
 public:
  // `key` is a column of texts that are never missing.
  SortedRun(const RowTable& table, size_t key);

  // All rows, `group_rows` a group.
  void WriteTo(ParquetFile& file, size_t group_rows);

 private:
  static constexpr size_t kNone = SIZE_MAX;

  // Where a column is in a row: its first word, or its bit where it is a truth value.
  struct Place {
    size_t at = 0;
    size_t validity = kNone;  // the bit that says whether it is there; none where it always is, or never
  };
  // What the spans of a group's column are of.
  struct Gathered {
    std::vector<uint32_t> places;
    std::vector<Text> dictionary;
    std::vector<int32_t> numbers;
    std::vector<int64_t> long_numbers;
    Bits bits;
    Bits validity;
  };

  void LayOut();
  void Sort();
  ParquetColumn Gather(size_t column, size_t begin, size_t end, Gathered& gathered);
  void GatherTexts(size_t column, size_t begin, size_t end, Gathered& gathered);
  void GatherBits(size_t bit, size_t begin, size_t end, Bits& bits) const;
  // Calls take(i, its first word) for each value that is there, the ith one; gives how many there are.
  template <class Take>
  size_t ForEachValue(Place place, size_t begin, size_t end, const Take& take) const;
  bool BitAt(size_t row, size_t bit) const { return (rows_[row * row_words_ + bit / 32] >> bit % 32 & 1) != 0; }

  const RowTable& table_;
  const size_t key_;
  const std::vector<Column> schema_;
  const std::vector<ColumnBuffers> buffers_;
  std::vector<Place> layout_;
  std::vector<bool> is_missing_;  // in all rows
  size_t row_words_ = 0;
  // In order. A row is together, since rows come from all over the table.
  std::unique_ptr<uint32_t[]> rows_;
  std::vector<uint32_t> places_;  // of texts in the dictionary that is being made
};

}  // namespace quillet
