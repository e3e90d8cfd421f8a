#include "corpus/sorted_run.h"

#include <algorithm>
#include <utility>

namespace quillet {

namespace {

constexpr uint32_t kNoPlace = UINT32_MAX;

// A text and its first bytes as a number, which nearly always decides.
struct RankedText {
  uint64_t head;
  Text text;
  uint32_t number;

  RankedText(Text of, uint32_t its_number) : head(0), text(of), number(its_number) {
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

template <class Value>
void GatherValues(const void* values, const Bits* validity, std::span<const uint32_t> rows, std::vector<Value>& out) {
  const auto* const all = static_cast<const Value*>(values);
  out.clear();
  out.reserve(rows.size());
  for (const uint32_t row : rows) {
    if (validity == nullptr || (*validity)[row]) out.push_back(all[row]);
  }
}

void GatherBits(const void* values, std::span<const uint32_t> rows, Bits& out) {
  const auto* const bytes = static_cast<const uint8_t*>(values);
  out = Bits();
  for (const uint32_t row : rows) out.Add((bytes[row / 8] >> row % 8 & 1) != 0);
}

}  // namespace

SortedRun::SortedRun(const RowTable& table, size_t key)
    : table_(table), key_(key), schema_(table.Schema()), buffers_(table.Buffers()) {
  size_t most_texts = 0;
  for (const ColumnBuffers& column : buffers_) most_texts = std::max(most_texts, column.dictionary.size);
  places_.assign(most_texts, kNoPlace);
  Sort();
}

void SortedRun::Sort() {
  const auto* const numbers = static_cast<const uint32_t*>(buffers_[key_].values[0]);
  const size_t size = table_.size();
  // Rows of each text, then where the next row of it belongs.
  const ColumnBuffers::Texts& texts = buffers_[key_].dictionary;
  std::vector<uint32_t> next(texts.size);
  for (size_t row = 0; row < size; ++row) ++next[numbers[row]];
  std::vector<RankedText> ranked;
  for (uint32_t number = 0; number < next.size(); ++number) {
    if (next[number] != 0) ranked.emplace_back(TextOf(texts, number), number);
  }
  std::sort(ranked.begin(), ranked.end());
  uint32_t begin = 0;
  for (const RankedText& text : ranked) begin += std::exchange(next[text.number], begin);
  order_.resize(size);
  for (uint32_t row = 0; row < size; ++row) order_[next[numbers[row]]++] = row;
}

void SortedRun::WriteTo(ParquetFile& file, size_t group_rows) {
  std::vector<Gathered> gathered(schema_.size());
  std::vector<ParquetColumn> columns(schema_.size());
  for (size_t begin = 0; begin < order_.size(); begin += group_rows) {
    const size_t end = std::min(begin + group_rows, order_.size());
    for (size_t i = 0; i < schema_.size(); ++i) columns[i] = Gather(i, begin, end, gathered[i]);
    // Sorted as the rows are, since places are given in their order.
    const std::vector<Text>& keys = gathered[key_].dictionary;
    columns[key_].bounds = {keys.front(), keys.back()};
    file.WriteGroup(end - begin, columns);
  }
}

ParquetColumn SortedRun::Gather(size_t column, size_t begin, size_t end, Gathered& gathered) {
  const std::span<const uint32_t> rows(order_.data() + begin, end - begin);
  const ColumnBuffers& buffers = buffers_[column];
  ParquetColumn out;
  if (buffers.validity != nullptr) {
    gathered.validity = Bits();
    for (const uint32_t row : rows) gathered.validity.Add((*buffers.validity)[row]);
    out.validity = &gathered.validity;
  }
  switch (schema_[column].format[0]) {
    case 'i':
      GatherValues(buffers.values[0], buffers.validity, rows, gathered.numbers);
      out.numbers = gathered.numbers;
      break;
    case 'l':
      GatherValues(buffers.values[0], buffers.validity, rows, gathered.long_numbers);
      out.long_numbers = gathered.long_numbers;
      break;
    case 'b':
      GatherBits(buffers.values[0], rows, gathered.bits);
      out.bits = &gathered.bits;
      break;
    default:
      GatherTexts(buffers, rows, gathered);
      out.places = gathered.places;
      out.dictionary = gathered.dictionary;
  }
  return out;
}

void SortedRun::GatherTexts(const ColumnBuffers& buffers, std::span<const uint32_t> rows, Gathered& gathered) {
  const auto* const numbers = static_cast<const uint32_t*>(buffers.values[0]);
  const Bits* const validity = buffers.validity;
  gathered.places.resize(rows.size());
  uint32_t* out = gathered.places.data();
  std::vector<uint32_t> used;
  for (const uint32_t row : rows) {
    if (validity != nullptr && !(*validity)[row]) continue;
    const uint32_t number = numbers[row];
    uint32_t& place = places_[number];
    if (place == kNoPlace) [[unlikely]] {
      place = static_cast<uint32_t>(used.size());
      used.push_back(number);
    }
    *out++ = place;
  }
  gathered.places.resize(static_cast<size_t>(out - gathered.places.data()));
  gathered.dictionary.clear();
  for (const uint32_t number : used) {
    gathered.dictionary.push_back(TextOf(buffers.dictionary, number));
    places_[number] = kNoPlace;
  }
}

}  // namespace quillet
