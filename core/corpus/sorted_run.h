// Rows in the order of one of their columns, as row groups of a Parquet file.
//
// Equal ones stay in the order in which they came. A table with numbered texts is what this takes: the texts of the
// column are ranked, each once, the rows counted into their places, and every column brought into their order, one
// after the other, so that what is read from all over fits into a cache. Each group gets dictionaries of what it holds:
// the keys in their order, other texts in the order in which they came, where neighbours are alike and compress well.
// Its memory serves run after run.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <span>
#include <vector>

#include "corpus/column_texts.h"
#include "corpus/parquet_file.h"
#include "corpus/row_tables.h"

namespace quillet {

class SortedRun {
 public:
  // All rows of a table, `group_rows` a group. `key` is a column of texts that are never missing.
  void Write(const RowTable& table, size_t key, size_t group_rows, ParquetFile& file);

 private:
  // Texts as the page of a dictionary has them.
  class Page {
   public:
    void Clear() { size_ = 0; }
    // With ColumnTexts::kSlack bytes behind it that can be read.
    void Append(Text bytes) {
      if (bytes.size() > room_ - size_) Grow(bytes.size());
      char* const at = bytes_.get() + size_;
      std::memcpy(at, bytes.data(), ColumnTexts::kSlack);
      if (bytes.size() > ColumnTexts::kSlack) [[unlikely]]
        std::memcpy(at, bytes.data(), bytes.size());
      size_ += bytes.size();
    }
    Text bytes() const { return {bytes_.get(), size_}; }

   private:
    void Grow(size_t by);

    std::unique_ptr<char[]> bytes_ = std::make_unique_for_overwrite<char[]>(ColumnTexts::kSlack);
    size_t room_ = 0;  // in front of the slack
    size_t size_ = 0;
  };
  // What the spans of a group's column are of.
  struct Gathered {
    std::vector<uint32_t> numbers_of_texts;
    std::vector<uint32_t> places;
    Page dictionary;
    size_t dictionary_size = 0;
    std::vector<int32_t> numbers;
    std::vector<int64_t> long_numbers;
    Bits bits;
    Bits validity;
  };
  // A column in the order of the rows. Of one that is missing everywhere there is nothing.
  struct Sorted {
    char type = 0;
    const ColumnTexts* texts = nullptr;
    std::vector<uint32_t> words;  // texts by their numbers, or numbers
    std::vector<uint64_t> long_words;
    Bits bits;
    Bits validity;
    bool has_validity = false;  // false where all rows have a value
    bool is_missing = false;
  };
  // A text and its first bytes as a number, which nearly always decides.
  struct RankedText {
    uint64_t head;
    Text text;
    size_t number;  // so wide that nothing of it is left out when it is moved

    RankedText(Text of, size_t its_number);
    friend bool operator<(const RankedText& a, const RankedText& b) {
      return a.head != b.head ? a.head < b.head : a.text < b.text;
    }
  };

  // Brings the rows into the order of their keys.
  void Order(const ColumnBuffers& keys, size_t size);
  void Take(const Column& column, const ColumnBuffers& from, Sorted& sorted) const;
  void Gather(const Sorted& sorted, bool is_key, size_t begin, size_t end, Gathered& gathered, ParquetColumn& out);
  void ListTexts(const ColumnTexts& texts, bool is_key, std::span<const uint32_t> numbers, Gathered& gathered);

  std::vector<RankedText> ranked_;
  std::vector<uint32_t> next_;   // of each text: how many rows have it, then where its next one belongs
  std::vector<uint32_t> order_;  // the rows
  std::vector<Sorted> sorted_;
  std::vector<Gathered> gathered_;
  // Of the texts in the dictionary that is being made: whether they are in it, by eights, and where.
  std::vector<uint64_t> are_listed_;
  std::vector<uint32_t> places_;
};

}  // namespace quillet
