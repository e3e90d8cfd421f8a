// Rows in the order of one of their columns, as row groups of a Parquet file.
//
// Equal ones stay in the order in which they came. A table with numbered texts is what this takes: the texts of the
// column are ranked, each once, the rows counted into their places, and every column brought into their order, one
// after the other, so that what is read from all over fits into a cache. Each group gets dictionaries of what it holds:
// the keys in their order, other texts in the order in which they came, where neighbours are alike and compress well.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
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
  // What the spans of a group's column are of.
  struct Gathered {
    std::vector<uint32_t> numbers_of_texts;
    std::vector<uint32_t> places;
    std::vector<Text> dictionary;
    std::vector<int32_t> numbers;
    std::vector<int64_t> long_numbers;
    Bits bits;
    Bits validity;
  };
  // A column in the order of the rows. Of one that is missing everywhere there is nothing.
  struct Sorted {
    std::unique_ptr<uint32_t[]> words;  // texts by their numbers, or numbers
    std::unique_ptr<uint64_t[]> long_words;
    std::optional<Bits> bits;
    std::optional<Bits> validity;  // none where all rows have a value
    bool is_missing = false;
  };

  // The rows in the order of their keys.
  std::unique_ptr<uint32_t[]> Order() const;
  Sorted Take(size_t column, const uint32_t* order) const;
  ParquetColumn Gather(size_t column, size_t begin, size_t end, Gathered& gathered);
  void ListTexts(size_t column, std::span<const uint32_t> numbers, Gathered& gathered);

  const RowTable& table_;
  const size_t key_;
  const std::vector<Column> schema_;
  const std::vector<ColumnBuffers> buffers_;
  std::vector<Sorted> sorted_;
  // Of the texts in the dictionary that is being made: whether they are in it, and where.
  std::vector<uint8_t> is_listed_;
  std::vector<uint32_t> places_;
};

}  // namespace quillet
