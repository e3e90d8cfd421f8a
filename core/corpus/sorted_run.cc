#include "corpus/sorted_run.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace quillet {

namespace {

// A text and its first bytes as a number, which nearly always decides.
struct RankedText {
  uint64_t head;
  Text text;
  size_t number;  // so wide that nothing of it is left out when it is moved

  RankedText(Text of, size_t its_number) : head(0), text(of), number(its_number) {
    for (size_t i = 0; i < 8; ++i) head = head << 8 | (i < of.size() ? static_cast<unsigned char>(of[i]) : 0u);
  }
  friend bool operator<(const RankedText& a, const RankedText& b) {
    return a.head != b.head ? a.head < b.head : a.text < b.text;
  }
};

Text TextOf(const ColumnBuffers::Texts& texts, uint32_t number) {
  const auto* const offsets = static_cast<const int64_t*>(texts.offsets) + number;
  return {static_cast<const char*>(texts.bytes) + offsets[0], static_cast<size_t>(offsets[1] - offsets[0])};
}

Bits TakeBits(const void* bits, const uint32_t* order, size_t size) {
  const auto* const bytes = static_cast<const uint8_t*>(bits);
  Bits taken;
  taken.Assign(size, [bytes, order](size_t i) { return (bytes[order[i] / 8] >> order[i] % 8 & 1) != 0; });
  return taken;
}

template <class Word>
std::unique_ptr<Word[]> TakeWords(const void* values, const uint32_t* order, size_t size) {
  const auto* const from = static_cast<const Word*>(values);
  auto taken = std::make_unique_for_overwrite<Word[]>(size);
  for (size_t i = 0; i < size; ++i) taken[i] = from[order[i]];
  return taken;
}

// The values of a part of the rows: where they lie, or those that are there one behind the other.
template <class Word, class Value>
std::span<const Value> ValuesOf(const Word* words, const Bits* validity, size_t begin, size_t end,
                                std::vector<Value>& values) {
  if (validity == nullptr) return {reinterpret_cast<const Value*>(words) + begin, end - begin};
  values.clear();
  for (size_t row = begin; row < end; ++row) {
    if ((*validity)[row]) values.push_back(static_cast<Value>(words[row]));
  }
  return values;
}

}  // namespace

SortedRun::SortedRun(const RowTable& table, size_t key)
    : table_(table), key_(key), schema_(table.Schema()), buffers_(table.Buffers()) {
  size_t most_texts = 0;
  for (const ColumnBuffers& column : buffers_) most_texts = std::max(most_texts, column.dictionary.size);
  is_listed_.assign(most_texts, 0);
  places_.resize(most_texts);
  const std::unique_ptr<uint32_t[]> order = Order();
  for (size_t i = 0; i < schema_.size(); ++i) sorted_.push_back(Take(i, order.get()));
}

std::unique_ptr<uint32_t[]> SortedRun::Order() const {
  const size_t size = table_.size();
  const auto* const keys = static_cast<const uint32_t*>(buffers_[key_].values[0]);
  const ColumnBuffers::Texts& texts = buffers_[key_].dictionary;
  // Rows of each text, then where the next row of it belongs.
  std::vector<uint32_t> next(texts.size);
  for (size_t row = 0; row < size; ++row) ++next[keys[row]];
  std::vector<RankedText> ranked;
  for (uint32_t number = 0; number < next.size(); ++number) {
    if (next[number] != 0) ranked.emplace_back(TextOf(texts, number), number);
  }
  std::sort(ranked.begin(), ranked.end());
  uint32_t begin = 0;
  for (const RankedText& text : ranked) begin += std::exchange(next[text.number], begin);
  auto order = std::make_unique_for_overwrite<uint32_t[]>(size);
  for (size_t row = 0; row < size; ++row) order[next[keys[row]]++] = static_cast<uint32_t>(row);
  return order;
}

SortedRun::Sorted SortedRun::Take(size_t column, const uint32_t* order) const {
  const size_t size = table_.size();
  const ColumnBuffers& from = buffers_[column];
  Sorted sorted;
  if (from.validity != nullptr) {
    sorted.is_missing = from.validity->false_count() == size;
    if (sorted.is_missing) return sorted;
    sorted.validity = TakeBits(from.validity->data(), order, size);
  }
  switch (schema_[column].format[0]) {
    case 'b':
      sorted.bits = TakeBits(from.values[0], order, size);
      break;
    case 'l':
      sorted.long_words = TakeWords<uint64_t>(from.values[0], order, size);
      break;
    default:
      sorted.words = TakeWords<uint32_t>(from.values[0], order, size);
  }
  return sorted;
}

void SortedRun::WriteTo(ParquetFile& file, size_t group_rows) {
  std::vector<Gathered> gathered(schema_.size());
  std::vector<ParquetColumn> columns(schema_.size());
  for (size_t begin = 0; begin < table_.size(); begin += group_rows) {
    const size_t end = std::min(begin + group_rows, table_.size());
    for (size_t i = 0; i < schema_.size(); ++i) columns[i] = Gather(i, begin, end, gathered[i]);
    const std::vector<Text>& keys = gathered[key_].dictionary;
    columns[key_].bounds = {keys.front(), keys.back()};
    file.WriteGroup(end - begin, columns);
  }
}

ParquetColumn SortedRun::Gather(size_t column, size_t begin, size_t end, Gathered& gathered) {
  ParquetColumn out;
  const Sorted& sorted = sorted_[column];
  if (sorted.is_missing) {
    gathered.validity = Bits();
    gathered.validity.Add(false, end - begin);
    out.validity = &gathered.validity;
    return out;
  }
  const Bits* const validity = sorted.validity ? &*sorted.validity : nullptr;
  if (validity != nullptr) {
    gathered.validity.Assign(end - begin, [validity, begin](size_t i) { return (*validity)[begin + i]; });
    out.validity = &gathered.validity;
  }
  switch (schema_[column].format[0]) {
    case 'i':
      out.numbers = ValuesOf(sorted.words.get(), validity, begin, end, gathered.numbers);
      break;
    case 'l':
      out.long_numbers = ValuesOf(sorted.long_words.get(), validity, begin, end, gathered.long_numbers);
      break;
    case 'b':
      gathered.bits.Assign(end - begin, [&sorted, begin](size_t i) { return (*sorted.bits)[begin + i]; });
      out.bits = &gathered.bits;
      break;
    default:
      ListTexts(column, ValuesOf(sorted.words.get(), validity, begin, end, gathered.numbers_of_texts), gathered);
      out.places = gathered.places;
      out.dictionary = gathered.dictionary;
  }
  return out;
}

// Makes a dictionary of the texts of a column that have these numbers, and their places in it.
void SortedRun::ListTexts(size_t column, std::span<const uint32_t> numbers, Gathered& gathered) {
  const ColumnBuffers::Texts& texts = buffers_[column].dictionary;
  gathered.dictionary.clear();
  gathered.places.resize(numbers.size());
  const auto list = [&](uint32_t number) {
    places_[number] = static_cast<uint32_t>(gathered.dictionary.size());
    gathered.dictionary.push_back(TextOf(texts, number));
  };
  if (column == key_) {
    for (size_t i = 0; i < numbers.size(); ++i) {
      if (i == 0 || numbers[i] != numbers[i - 1]) list(numbers[i]);
    }
  } else {
    for (const uint32_t number : numbers) is_listed_[number] = 1;
    uint8_t* const begin = is_listed_.data();
    uint8_t* const end = begin + texts.size;
    for (uint8_t* at = begin; at < end; *at++ = 0) {
      at = static_cast<uint8_t*>(std::memchr(at, 1, static_cast<size_t>(end - at)));
      if (at == nullptr) break;
      list(static_cast<uint32_t>(at - begin));
    }
  }
  for (size_t i = 0; i < numbers.size(); ++i) gathered.places[i] = places_[numbers[i]];
}

}  // namespace quillet
