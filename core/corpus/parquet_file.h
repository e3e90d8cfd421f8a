// A Parquet file that grows row group by row group.
//
// Texts are dictionaries, a group its own, and their places in it as wide as a byte or two, so that they are written
// as they lie and compress as well as narrower ones. So are small numbers where they repeat; others are plain. Pages
// are compressed by whoever asks for the file, with zstd. One column may have its bounds in each group, for readers
// that skip groups by them.
//
// The format is that of Apache Parquet; the footer is in Thrift's compact protocol.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "foundations/text.h"
#include "output/arrow_export.h"

namespace quillet {

// A column of a row group. What belongs to its type is set, and stands while it is written.
struct ParquetColumn {
  std::span<const uint32_t> places;  // of texts: in the dictionary
  Text dictionary;                   // one text behind the other, each behind its length in four bytes
  size_t dictionary_size = 0;        // in texts
  std::span<const int32_t> numbers;
  std::span<const int64_t> long_numbers;
  const Bits* bits = nullptr;
  // Without it, no row is null. Null rows have no value in the columns above, except in `bits`.
  const Bits* validity = nullptr;
  // Of texts: the least and the greatest one.
  struct Bounds {
    Text least, greatest;
  };
  std::optional<Bounds> bounds = std::nullopt;
};

class ParquetFile {
 public:
  // Texts that are longer are no bounds.
  static constexpr size_t kLongestBound = 4096;

  // Compresses with zstd, at whatever level, into what is empty.
  using Compress = std::function<void(Text bytes, std::string& compressed)>;

  // The types are "u", "i", "l" and "b"; groups are sorted by the column `key`.
  ParquetFile(std::vector<Column> columns, size_t key, Compress compress);

  // In the order of the columns, which are as long as the group.
  void WriteGroup(size_t size, std::span<const ParquetColumn> columns);
  // The end of the file, with a text of its own in it.
  void Finish(Text key, Text value);

  size_t row_count() const { return row_count_; }
  // Exchanges the bytes since the last call for what is in `taken`, whose memory is used for those that follow.
  void TakeBytes(std::string& taken) {
    taken.clear();
    taken.swap(bytes_);
  }

 private:
  struct Chunk {
    size_t offset, dictionary_size;  // the bytes of the dictionary's page, 0 without one
    size_t value_count, null_count;
    size_t size, plain_size;  // in bytes, compressed or not, headers included
    std::optional<std::pair<std::string, std::string>> bounds;
  };
  struct Group {
    size_t size;
    std::vector<Chunk> chunks;
  };

  bool FindNumbers(std::span<const int32_t> numbers);
  Chunk WriteColumn(size_t size, const Column& type, const ParquetColumn& column);
  // The bytes as a page with this header behind its sizes; sets the chunk's sizes.
  void WritePage(Text page, bool is_dictionary, size_t value_count, bool has_places, Chunk& chunk);
  std::string Footer(Text key, Text value) const;

  const std::vector<Column> columns_;
  const size_t key_;
  const Compress compress_;
  std::string bytes_;
  size_t written_ = 0;  // bytes of the file so far
  size_t row_count_ = 0;
  std::vector<Group> groups_;
  std::string page_;
  std::string compressed_;
  // The dictionary of a column of numbers, and the places of these in it.
  std::vector<int32_t> found_numbers_;
  std::vector<uint32_t> number_places_;
  std::vector<uint32_t> place_of_number_;
};

}  // namespace quillet
