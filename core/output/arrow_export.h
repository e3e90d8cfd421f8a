// Tables of columns as structures of the Arrow C data interface. The buffers are those of the table, which lives
// until the reader has released them all.
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "analysis/record_table.h"
#include "output/arrow_data.h"

namespace quillet {

struct Column {
  std::string name;
  std::string format;      // as the interface spells types; of indices where there is a dictionary
  std::string dictionary;  // the format of its texts; empty where values stand for themselves
  bool may_be_null = false;
};

// Truth values, a bit each.
class Bits {
 public:
  void Add(bool value) {
    if (size_ % 8 == 0) bytes_.push_back(0);
    if (value) bytes_.back() = static_cast<uint8_t>(bytes_.back() | 1u << size_ % 8);
    ++size_;
    false_count_ += !value;
  }
  void Add(bool value, size_t count) {
    if (!value) {
      size_ += count;
      false_count_ += count;
      return bytes_.resize((size_ + 7) / 8);  // behind the last one there are zeros
    }
    for (; count > 0 && size_ % 8 != 0; --count) Add(true);
    bytes_.insert(bytes_.end(), count / 8, uint8_t{0xFF});
    size_ += count / 8 * 8;
    for (count %= 8; count > 0; --count) Add(true);
  }
  // So many more, the ith of which is bit_at(i).
  template <class BitAt>
  void AddEach(size_t count, const BitAt& bit_at) {
    size_t truths = 0;
    size_t at = size_;
    size_ += count;
    bytes_.resize((size_ + 7) / 8);
    for (size_t i = 0; i < count; ++i, ++at) {
      const bool bit = bit_at(i);
      bytes_[at / 8] = static_cast<uint8_t>(bytes_[at / 8] | bit << at % 8);
      truths += bit;
    }
    false_count_ += count - truths;
  }
  // So many, the ith of which is bit_at(i).
  template <class BitAt>
  void Assign(size_t size, const BitAt& bit_at) {
    bytes_.resize((size + 7) / 8);
    size_ = size;
    false_count_ = size;
    for (size_t at = 0; at < size; at += 8) {
      const size_t count = std::min<size_t>(size - at, 8);
      uint32_t byte = 0;
      for (size_t i = 0; i < count; ++i) byte |= static_cast<uint32_t>(bit_at(at + i)) << i;
      bytes_[at / 8] = static_cast<uint8_t>(byte);
      false_count_ -= static_cast<size_t>(std::popcount(byte));
    }
  }
  void Truncate(size_t size);
  const void* data() const { return bytes_.data(); }
  size_t size() const { return size_; }
  size_t false_count() const { return false_count_; }
  bool operator[](size_t i) const { return (bytes_[i / 8] >> i % 8 & 1) != 0; }

 private:
  std::vector<uint8_t> bytes_;
  size_t size_ = 0;
  size_t false_count_ = 0;
};

// The buffers of one column.
struct ColumnBuffers {
  // Texts one behind the other.
  struct Texts {
    size_t size = 0;
    const void* offsets = nullptr;
    const void* bytes = nullptr;
  };

  std::vector<const void*> values;
  Texts dictionary = {};
  const Bits* validity = nullptr;  // without it, no row is null

  static ColumnBuffers Of(const TextList& texts, const Bits* validity = nullptr) {
    return {{texts.offsets.data(), texts.bytes.data()}, {}, validity};
  }
  static Texts DictionaryOf(const TextList& texts) { return {texts.size(), texts.offsets.data(), texts.bytes.data()}; }
};

class ColumnTable {
 public:
  virtual ~ColumnTable() = default;
  virtual size_t size() const = 0;
  // In the order of the schema. They stand as long as nothing is added.
  virtual std::vector<ColumnBuffers> Buffers() const = 0;
};

// Both are the caller's to release.
void FillTableSchema(std::span<const Column> columns, ArrowSchema* schema);
void FillTableArray(const std::shared_ptr<const ColumnTable>& table, ArrowArray* array);

}  // namespace quillet
