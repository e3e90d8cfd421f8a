#include "corpus/sorted_run.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <utility>

namespace quillet {

namespace {

void TakeBits(const void* bits, std::span<const uint32_t> order, Bits& taken) {
  const auto* const bytes = static_cast<const uint8_t*>(bits);
  taken.Assign(order.size(), [bytes, order](size_t i) { return (bytes[order[i] / 8] >> order[i] % 8 & 1) != 0; });
}

template <class Word>
void TakeWords(const void* values, std::span<const uint32_t> order, std::vector<Word>& taken) {
  const auto* const from = static_cast<const Word*>(values);
  taken.resize(order.size());
  for (size_t i = 0; i < order.size(); ++i) taken[i] = from[order[i]];
}

// The values of a part of the rows: where they lie, or those that are there one behind the other.
template <class Word, class Value>
std::span<const Value> ValuesOf(const std::vector<Word>& words, const Bits* validity, size_t begin, size_t end,
                                std::vector<Value>& values) {
  if (validity == nullptr) return {reinterpret_cast<const Value*>(words.data()) + begin, end - begin};
  values.clear();
  for (size_t row = begin; row < end; ++row) {
    if ((*validity)[row]) values.push_back(static_cast<Value>(words[row]));
  }
  return values;
}

}  // namespace

void SortedRun::Page::Grow(size_t by) {
  const size_t room = std::max(2 * room_, size_ + by);
  auto bytes = std::make_unique_for_overwrite<char[]>(room + ColumnTexts::kSlack);
  std::memcpy(bytes.get(), bytes_.get(), size_);
  bytes_ = std::move(bytes);
  room_ = room;
}

SortedRun::RankedText::RankedText(Text of, size_t its_number) : head(0), text(of), number(its_number) {
  for (size_t i = 0; i < 8; ++i) head = head << 8 | (i < of.size() ? static_cast<unsigned char>(of[i]) : 0u);
}

void SortedRun::Write(const RowTable& table, size_t key, size_t group_rows, ParquetFile& file) {
  const std::vector<Column> schema = table.Schema();
  const std::vector<ColumnBuffers> buffers = table.Buffers();
  const size_t size = table.size();
  Order(buffers[key], size);
  sorted_.resize(schema.size());
  gathered_.resize(schema.size());
  for (size_t i = 0; i < schema.size(); ++i) Take(schema[i], buffers[i], sorted_[i]);
  for (size_t begin = 0; begin < size; begin += group_rows) {
    const size_t end = std::min(begin + group_rows, size);
    std::vector<ParquetColumn> columns(schema.size());
    for (size_t i = 0; i < schema.size(); ++i) Gather(sorted_[i], i == key, begin, end, gathered_[i], columns[i]);
    file.WriteGroup(end - begin, columns);
  }
}

void SortedRun::Order(const ColumnBuffers& keys, size_t size) {
  const auto* const numbers = static_cast<const uint32_t*>(keys.values[0]);
  const auto& texts = *static_cast<const ColumnTexts*>(keys.values[1]);
  next_.assign(texts.size(), 0);
  for (size_t row = 0; row < size; ++row) ++next_[numbers[row]];
  ranked_.clear();
  for (uint32_t number = 0; number < next_.size(); ++number) {
    if (next_[number] != 0) ranked_.emplace_back(texts.TextOf(number), number);
  }
  std::sort(ranked_.begin(), ranked_.end());
  uint32_t begin = 0;
  for (const RankedText& text : ranked_) begin += std::exchange(next_[text.number], begin);
  order_.resize(size);
  for (size_t row = 0; row < size; ++row) order_[next_[numbers[row]]++] = static_cast<uint32_t>(row);
}

void SortedRun::Take(const Column& column, const ColumnBuffers& from, Sorted& sorted) const {
  sorted.type = column.format[0];
  sorted.has_validity = from.validity != nullptr;
  sorted.is_missing = sorted.has_validity && from.validity->false_count() == order_.size();
  if (sorted.is_missing) return;
  if (sorted.has_validity) TakeBits(from.validity->data(), order_, sorted.validity);
  switch (sorted.type) {
    case 'b':
      return TakeBits(from.values[0], order_, sorted.bits);
    case 'l':
      return TakeWords(from.values[0], order_, sorted.long_words);
    case 'u':
      sorted.texts = static_cast<const ColumnTexts*>(from.values[1]);
      break;
    default:
      break;
  }
  TakeWords(from.values[0], order_, sorted.words);
}

void SortedRun::Gather(const Sorted& sorted, bool is_key, size_t begin, size_t end, Gathered& gathered,
                       ParquetColumn& out) {
  if (sorted.is_missing) {
    gathered.validity = Bits();
    gathered.validity.Add(false, end - begin);
    out.validity = &gathered.validity;
    return;
  }
  const Bits* const validity = sorted.has_validity ? &sorted.validity : nullptr;
  if (validity != nullptr) {
    gathered.validity.Assign(end - begin, [validity, begin](size_t i) { return (*validity)[begin + i]; });
    out.validity = &gathered.validity;
  }
  switch (sorted.type) {
    case 'i':
      out.numbers = ValuesOf(sorted.words, validity, begin, end, gathered.numbers);
      break;
    case 'l':
      out.long_numbers = ValuesOf(sorted.long_words, validity, begin, end, gathered.long_numbers);
      break;
    case 'b':
      gathered.bits.Assign(end - begin, [&sorted, begin](size_t i) { return sorted.bits[begin + i]; });
      out.bits = &gathered.bits;
      break;
    default: {
      const auto numbers = ValuesOf(sorted.words, validity, begin, end, gathered.numbers_of_texts);
      ListTexts(*sorted.texts, is_key, numbers, gathered);
      out.places = gathered.places;
      out.dictionary = gathered.dictionary.bytes();
      out.dictionary_size = gathered.dictionary_size;
      if (is_key) out.bounds = {sorted.texts->TextOf(numbers.front()), sorted.texts->TextOf(numbers.back())};
    }
  }
}

// Makes a dictionary of the texts that have these numbers, and their places in it.
void SortedRun::ListTexts(const ColumnTexts& texts, bool is_key, std::span<const uint32_t> numbers,
                          Gathered& gathered) {
  gathered.dictionary.Clear();
  gathered.places.resize(numbers.size());
  if (places_.size() < texts.size()) places_.resize(texts.size());
  uint32_t listed = 0;
  if (is_key) {
    for (size_t i = 0; i < numbers.size(); ++i) {
      if (i == 0 || numbers[i] != numbers[i - 1]) {
        gathered.dictionary.Append(texts.Page(numbers[i], numbers[i] + 1));
        ++listed;
      }
      gathered.places[i] = listed - 1;
    }
    gathered.dictionary_size = listed;
    return;
  }
  const size_t eights = texts.size() / 8 + 1;
  if (are_listed_.size() < eights) are_listed_.resize(eights);
  auto* const is_listed = reinterpret_cast<uint8_t*>(are_listed_.data());
  for (const uint32_t number : numbers) is_listed[number] = 1;
  // Those that follow one another are taken together.
  uint32_t begin = 0;
  uint32_t end = 0;
  for (size_t eight = 0; eight < eights; ++eight) {
    for (uint64_t left = std::exchange(are_listed_[eight], 0); left != 0; left &= left - 1) {
      const auto number = static_cast<uint32_t>(8 * eight) + static_cast<uint32_t>(std::countr_zero(left)) / 8;
      places_[number] = listed++;
      if (number != end) {
        if (begin != end) gathered.dictionary.Append(texts.Page(begin, end));
        begin = number;
      }
      end = number + 1;
    }
  }
  if (begin != end) gathered.dictionary.Append(texts.Page(begin, end));
  for (size_t i = 0; i < numbers.size(); ++i) gathered.places[i] = places_[numbers[i]];
  gathered.dictionary_size = listed;
}

}  // namespace quillet
