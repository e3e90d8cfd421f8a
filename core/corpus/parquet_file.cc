// Field numbers and words as the format's Thrift definitions have them.
#include "corpus/parquet_file.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <utility>

namespace quillet {

namespace {

constexpr Text kMagic = "PAR1";

enum PhysicalType : uint8_t { kBoolean = 0, kInt32 = 1, kInt64 = 2, kByteArray = 6 };
enum Encoding : uint8_t { kPlain = 0, kRunLengths = 3, kDictionaryPlaces = 8 };
constexpr int kZstd = 6;

PhysicalType PhysicalTypeOf(const Column& column) {
  switch (column.format[0]) {
    case 'b':
      return kBoolean;
    case 'i':
      return kInt32;
    case 'l':
      return kInt64;
    default:
      return kByteArray;
  }
}

// ---- Thrift ----

// A structure, and those inside it, as the compact protocol spells them.
class ThriftText {
 public:
  enum Type : uint8_t { kTrue = 1, kFalse = 2, kInt16 = 4, kWord = 5, kLong = 6, kBinary = 8, kList = 9, kStruct = 12 };

  explicit ThriftText(std::string& out) : out_(out) {}

  void Number(int field, Type type, int64_t value) {
    Begin(field, type);
    AppendZigzag(value);
  }
  void Truth(int field, bool value) { Begin(field, value ? kTrue : kFalse); }
  void Binary(int field, Text value) {
    Begin(field, kBinary);
    AppendBinary(value);
  }
  void List(int field, Type type, size_t size) {
    Begin(field, kList);
    if (size < 15) {
      out_ += static_cast<char>(size << 4 | type);
    } else {
      out_ += static_cast<char>(0xF0 | type);
      AppendVarint(size);
    }
  }
  // A structure in a field, or without one as an element of a list.
  void Open(int field) {
    Begin(field, kStruct);
    Open();
  }
  void Open() { fields_.push_back(0); }
  void Close() {
    out_ += '\0';
    fields_.pop_back();
  }

  void AppendBinary(Text value) {
    AppendVarint(value.size());
    out_ += value;
  }
  void AppendZigzag(int64_t value) {
    AppendVarint(static_cast<uint64_t>(value) << 1 ^ static_cast<uint64_t>(value >> 63));
  }

 private:
  void Begin(int field, Type type) {
    const int step = field - fields_.back();
    out_ += static_cast<char>(step << 4 | type);  // never more than 15
    fields_.back() = field;
  }
  void AppendVarint(uint64_t value) {
    for (; value >= 0x80; value >>= 7) out_ += static_cast<char>(value | 0x80);
    out_ += static_cast<char>(value);
  }

  std::string& out_;
  std::vector<int> fields_;  // the last one of each open structure
};

// ---- values ----

template <class Number>
void AppendPlain(std::span<const Number> numbers, std::string& out) {
  static_assert(std::endian::native == std::endian::little, "numbers are written as they lie");
  out.append(reinterpret_cast<const char*>(numbers.data()), numbers.size_bytes());
}

// Numbers of a few bits as runs: of one that is repeated, or of others in groups of eight that are packed.
class RunLengths {
 public:
  // 1, 8, 16 or 32 bits.
  RunLengths(uint32_t bits, std::string& out) : bits_(bits), out_(out) {}

  template <class NumberAt>
  void Append(size_t count, const NumberAt& number_at) {
    size_t packed = 0;  // the first one that is not written
    for (size_t at = 0; at + kFewestRepeated <= count;) {
      const uint32_t number = number_at(at);
      const auto is_repeated = [&](size_t i) { return number_at(i) == number; };
      size_t end = at + kFewestRepeated;
      // What is not sorted differs at the end already.
      if (!is_repeated(end - 1) || !AreAll(at + 1, end - 1, is_repeated)) {
        at += kGroup;
        continue;
      }
      while (end < count && is_repeated(end)) ++end;
      AppendPacked(packed, at, number_at);
      AppendVarint((end - at) << 1);
      AppendLow(number);
      packed = at = end;
    }
    AppendPacked(packed, count, number_at);
  }

 private:
  static constexpr size_t kGroup = 8;
  static constexpr size_t kFewestRepeated = 16;

  template <class Test>
  static bool AreAll(size_t begin, size_t end, const Test& test) {
    while (begin < end && test(begin)) ++begin;
    return begin == end;
  }

  template <class NumberAt>
  void AppendPacked(size_t begin, size_t end, const NumberAt& number_at) {
    if (begin == end) return;
    const size_t groups = (end - begin + kGroup - 1) / kGroup;
    AppendVarint(groups << 1 | 1);
    const size_t at = out_.size();
    out_.resize(at + groups * bits_);  // in bytes, zeros
    auto* const bytes = reinterpret_cast<uint8_t*>(out_.data()) + at;
    const auto put_each = [&](const auto& put) {
      for (size_t i = begin; i < end; ++i) put(i - begin, number_at(i));
    };
    switch (bits_) {
      case 1:
        return put_each([bytes](size_t i, uint32_t number) {
          bytes[i / 8] = static_cast<uint8_t>(bytes[i / 8] | number << i % 8);
        });
      case 8:
        return put_each([bytes](size_t i, uint32_t number) { bytes[i] = static_cast<uint8_t>(number); });
      case 16:
        return put_each([bytes](size_t i, uint32_t number) {
          const auto low = static_cast<uint16_t>(number);
          std::memcpy(bytes + i * 2, &low, 2);
        });
      default:
        return put_each([bytes](size_t i, uint32_t number) { std::memcpy(bytes + i * 4, &number, 4); });
    }
  }
  void AppendLow(uint32_t number) {
    for (uint32_t bit = 0; bit < bits_; bit += 8) out_ += static_cast<char>(number >> bit);
  }
  void AppendVarint(uint64_t value) {
    for (; value >= 0x80; value >>= 7) out_ += static_cast<char>(value | 0x80);
    out_ += static_cast<char>(value);
  }

  const uint32_t bits_;
  std::string& out_;
};

// Which rows have a value, with the bytes that this takes in front.
void AppendValidity(size_t size, const Bits* validity, std::string& out) {
  const size_t at = out.size();
  out.append(4, '\0');
  RunLengths runs(1, out);
  if (validity == nullptr || validity->false_count() == 0)
    runs.Append(size, [](size_t) { return 1u; });
  else
    runs.Append(size, [validity](size_t i) { return static_cast<uint32_t>((*validity)[i]); });
  const auto length = static_cast<uint32_t>(out.size() - at - 4);
  std::memcpy(out.data() + at, &length, 4);
}

}  // namespace

ParquetFile::ParquetFile(std::vector<Column> columns, size_t key, Compress compress)
    : columns_(std::move(columns)),
      key_(key),
      compress_(std::move(compress)),
      bytes_(kMagic),
      written_(kMagic.size()) {}

void ParquetFile::WriteGroup(size_t size, std::span<const ParquetColumn> columns) {
  Group group{size, {}};
  for (size_t i = 0; i < columns_.size(); ++i) group.chunks.push_back(WriteColumn(size, columns_[i], columns[i]));
  groups_.push_back(std::move(group));
  row_count_ += size;
}

ParquetFile::Chunk ParquetFile::WriteColumn(size_t size, const Column& type, const ParquetColumn& column) {
  const size_t null_count = column.validity != nullptr ? column.validity->false_count() : 0;
  Chunk chunk{written_, 0, size, null_count, 0, 0, {}};
  const PhysicalType physical = PhysicalTypeOf(type);
  std::span<const uint32_t> places = column.places;
  Text dictionary = column.dictionary;
  size_t dictionary_size = column.dictionary_size;
  if (physical == kByteArray) {
    if (column.bounds && std::max(column.bounds->least.size(), column.bounds->greatest.size()) <= kLongestBound)
      chunk.bounds.emplace(column.bounds->least, column.bounds->greatest);
  } else if (physical == kInt32 && FindNumbers(column.numbers)) {
    page_.clear();
    AppendPlain(std::span<const int32_t>(found_numbers_), page_);
    dictionary = page_;
    places = number_places_;
    dictionary_size = found_numbers_.size();
  }
  const bool has_dictionary = physical == kByteArray || !places.empty();
  if (has_dictionary) {
    WritePage(dictionary, true, dictionary_size, false, chunk);
    chunk.dictionary_size = chunk.size;
  }
  page_.clear();
  if (type.may_be_null) AppendValidity(size, column.validity, page_);
  if (has_dictionary) {
    const uint32_t bits = dictionary_size <= 1 << 8 ? 8 : dictionary_size <= 1 << 16 ? 16 : 32;
    page_ += static_cast<char>(bits);
    RunLengths(bits, page_).Append(places.size(), [places](size_t i) { return places[i]; });
  } else if (physical == kInt32) {
    AppendPlain(column.numbers, page_);
  } else if (physical == kInt64) {
    AppendPlain(column.long_numbers, page_);
  } else {
    page_.append(static_cast<const char*>(column.bits->data()), (size + 7) / 8);
  }
  WritePage(page_, false, size, has_dictionary, chunk);
  return chunk;
}

// Makes a dictionary of small numbers; false where it is not worth while.
bool ParquetFile::FindNumbers(std::span<const int32_t> numbers) {
  constexpr uint32_t kNoPlace = UINT32_MAX;
  constexpr uint32_t kMost = 1 << 16;
  if (place_of_number_.empty()) place_of_number_.assign(kMost, kNoPlace);
  number_places_.resize(numbers.size());
  found_numbers_.clear();
  const size_t most = numbers.size() / 4;
  size_t count = 0;
  for (; count < numbers.size(); ++count) {
    const auto small = static_cast<uint32_t>(numbers[count]);
    if (small >= kMost) break;
    uint32_t& place = place_of_number_[small];
    if (place == kNoPlace) {
      if (found_numbers_.size() == most) break;
      place = static_cast<uint32_t>(found_numbers_.size());
      found_numbers_.push_back(numbers[count]);
    }
    number_places_[count] = place;
  }
  for (const int32_t number : found_numbers_) place_of_number_[static_cast<uint32_t>(number)] = kNoPlace;
  return count == numbers.size();
}

void ParquetFile::WritePage(Text page, bool is_dictionary, size_t value_count, bool has_places, Chunk& chunk) {
  compressed_.clear();
  compress_(page, compressed_);
  const size_t begin = bytes_.size();
  ThriftText header(bytes_);
  header.Open();
  header.Number(1, ThriftText::kWord, is_dictionary ? 2 : 0);
  header.Number(2, ThriftText::kWord, static_cast<int64_t>(page.size()));
  header.Number(3, ThriftText::kWord, static_cast<int64_t>(compressed_.size()));
  header.Open(is_dictionary ? 7 : 5);
  header.Number(1, ThriftText::kWord, static_cast<int64_t>(value_count));
  header.Number(2, ThriftText::kWord, has_places ? kDictionaryPlaces : kPlain);
  if (!is_dictionary) {
    header.Number(3, ThriftText::kWord, kRunLengths);
    header.Number(4, ThriftText::kWord, kRunLengths);
  }
  header.Close();
  header.Close();
  chunk.plain_size += bytes_.size() - begin + page.size();
  bytes_ += compressed_;
  chunk.size += bytes_.size() - begin;
  written_ += bytes_.size() - begin;
}

void ParquetFile::Finish(Text key, Text value) {
  const std::string footer = Footer(key, value);
  const auto length = static_cast<uint32_t>(footer.size());
  bytes_ += footer;
  bytes_.append(reinterpret_cast<const char*>(&length), 4);
  bytes_ += kMagic;
}

std::string ParquetFile::Footer(Text key, Text value) const {
  std::string footer;
  ThriftText out(footer);
  out.Open();
  out.Number(1, ThriftText::kWord, 2);  // the format's version

  out.List(2, ThriftText::kStruct, columns_.size() + 1);
  out.Open();
  out.Binary(4, "schema");
  out.Number(5, ThriftText::kWord, static_cast<int64_t>(columns_.size()));
  out.Close();
  for (const Column& column : columns_) {
    const PhysicalType physical = PhysicalTypeOf(column);
    out.Open();
    out.Number(1, ThriftText::kWord, physical);
    out.Number(3, ThriftText::kWord, column.may_be_null ? 1 : 0);
    out.Binary(4, column.name);
    if (physical == kByteArray) {
      out.Number(6, ThriftText::kWord, 0);
      out.Open(10);
      out.Open(1);  // a string
      out.Close();
      out.Close();
    }
    out.Close();
  }

  out.Number(3, ThriftText::kLong, static_cast<int64_t>(row_count_));
  out.List(4, ThriftText::kStruct, groups_.size());
  for (const Group& group : groups_) {
    size_t plain_size = 0;
    size_t size = 0;
    out.Open();
    out.List(1, ThriftText::kStruct, columns_.size());
    for (size_t i = 0; i < columns_.size(); ++i) {
      const Chunk& chunk = group.chunks[i];
      const PhysicalType physical = PhysicalTypeOf(columns_[i]);
      plain_size += chunk.plain_size;
      size += chunk.size;
      out.Open();
      out.Number(2, ThriftText::kLong, 0);  // where this is written again, which is nowhere
      out.Open(3);
      out.Number(1, ThriftText::kWord, physical);
      out.List(2, ThriftText::kWord, chunk.dictionary_size != 0 ? 3 : 2);
      out.AppendZigzag(kPlain);
      out.AppendZigzag(kRunLengths);
      if (chunk.dictionary_size != 0) out.AppendZigzag(kDictionaryPlaces);
      out.List(3, ThriftText::kBinary, 1);
      out.AppendBinary(columns_[i].name);
      out.Number(4, ThriftText::kWord, kZstd);
      out.Number(5, ThriftText::kLong, static_cast<int64_t>(chunk.value_count));
      out.Number(6, ThriftText::kLong, static_cast<int64_t>(chunk.plain_size));
      out.Number(7, ThriftText::kLong, static_cast<int64_t>(chunk.size));
      out.Number(9, ThriftText::kLong, static_cast<int64_t>(chunk.offset + chunk.dictionary_size));
      if (chunk.dictionary_size != 0) out.Number(11, ThriftText::kLong, static_cast<int64_t>(chunk.offset));
      out.Open(12);
      out.Number(3, ThriftText::kLong, static_cast<int64_t>(chunk.null_count));
      if (chunk.bounds) {
        out.Binary(5, chunk.bounds->second);
        out.Binary(6, chunk.bounds->first);
      }
      out.Close();
      out.Close();
      out.Close();
    }
    out.Number(2, ThriftText::kLong, static_cast<int64_t>(plain_size));
    out.Number(3, ThriftText::kLong, static_cast<int64_t>(group.size));
    out.List(4, ThriftText::kStruct, 1);
    out.Open();
    out.Number(1, ThriftText::kWord, static_cast<int64_t>(key_));
    out.Truth(2, false);  // not falling
    out.Truth(3, false);  // nulls are not first
    out.Close();
    out.Number(5, ThriftText::kLong, static_cast<int64_t>(group.chunks.front().offset));
    out.Number(6, ThriftText::kLong, static_cast<int64_t>(size));
    out.Close();
  }

  out.List(5, ThriftText::kStruct, 1);
  out.Open();
  out.Binary(1, key);
  out.Binary(2, value);
  out.Close();
  out.Binary(6, "quillet version 1");
  // Bounds are in the order of the types: bytes as unsigned numbers.
  out.List(7, ThriftText::kStruct, columns_.size());
  for (size_t i = 0; i < columns_.size(); ++i) {
    out.Open();
    out.Open(1);
    out.Close();
    out.Close();
  }
  out.Close();
  return footer;
}

}  // namespace quillet
