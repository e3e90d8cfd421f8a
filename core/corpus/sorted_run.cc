#include "corpus/sorted_run.h"

#include <algorithm>
#include <cstring>
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

}  // namespace

SortedRun::SortedRun(const RowTable& table, size_t key)
    : table_(table), key_(key), schema_(table.Schema()), buffers_(table.Buffers()) {
  size_t most_texts = 0;
  for (const ColumnBuffers& column : buffers_) most_texts = std::max(most_texts, column.dictionary.size);
  places_.assign(most_texts, kNoPlace);
  LayOut();
  Sort();
}

// The bits first, then the words.
void SortedRun::LayOut() {
  size_t bits = 0;
  for (size_t i = 0; i < schema_.size(); ++i) {
    Place& place = layout_.emplace_back();
    if (schema_[i].format == "b") place.at = bits++;
    if (buffers_[i].validity != nullptr) place.validity = bits++;
  }
  row_words_ = (bits + 31) / 32;
  for (size_t i = 0; i < schema_.size(); ++i) {
    if (schema_[i].format == "b") continue;
    layout_[i].at = row_words_;
    row_words_ += schema_[i].format == "l" ? 2 : 1;
  }
}

void SortedRun::Sort() {
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

  // What is copied into a row: words, and bits of bytes.
  std::vector<std::pair<const uint32_t*, size_t>> words;  // and the distance between two rows
  std::vector<size_t> places;
  std::vector<std::pair<const uint8_t*, size_t>> bits;
  for (size_t i = 0; i < schema_.size(); ++i) {
    const auto* const values = buffers_[i].values[0];
    if (schema_[i].format == "b") {
      bits.emplace_back(static_cast<const uint8_t*>(values), layout_[i].at);
    } else {
      const size_t step = schema_[i].format == "l" ? 2 : 1;
      for (size_t word = 0; word < step; ++word) {
        words.emplace_back(static_cast<const uint32_t*>(values) + word, step);
        places.push_back(layout_[i].at + word);
      }
    }
    if (const Bits* const validity = buffers_[i].validity)
      bits.emplace_back(static_cast<const uint8_t*>(validity->data()), layout_[i].validity);
  }
  rows_.resize(size * row_words_);
  for (size_t row = 0; row < size; ++row) {
    uint32_t* const out = rows_.data() + next[keys[row]]++ * row_words_;
    for (size_t i = 0; i < words.size(); ++i) out[places[i]] = words[i].first[row * words[i].second];
    for (const auto& [bytes, bit] : bits) out[bit / 32] |= (bytes[row / 8] >> row % 8 & 1u) << bit % 32;
  }
}

void SortedRun::WriteTo(ParquetFile& file, size_t group_rows) {
  std::vector<Gathered> gathered(schema_.size());
  std::vector<ParquetColumn> columns(schema_.size());
  for (size_t begin = 0; begin < table_.size(); begin += group_rows) {
    const size_t end = std::min(begin + group_rows, table_.size());
    for (size_t i = 0; i < schema_.size(); ++i) columns[i] = Gather(i, begin, end, gathered[i]);
    // Sorted as the rows are, since places are given in their order.
    const std::vector<Text>& keys = gathered[key_].dictionary;
    columns[key_].bounds = {keys.front(), keys.back()};
    file.WriteGroup(end - begin, columns);
  }
}

ParquetColumn SortedRun::Gather(size_t column, size_t begin, size_t end, Gathered& gathered) {
  ParquetColumn out;
  const bool may_be_missing = buffers_[column].validity != nullptr;
  const Place place = layout_[column];
  if (may_be_missing) {
    GatherBits(place.validity, begin, end, gathered.validity);
    out.validity = &gathered.validity;
  }
  const auto for_each = [&](const auto& take) {
    for (size_t row = begin; row < end; ++row) {
      if (!may_be_missing || BitAt(row, place.validity)) take(row);
    }
  };
  switch (schema_[column].format[0]) {
    case 'i':
      gathered.numbers.clear();
      for_each([&](size_t row) { gathered.numbers.push_back(static_cast<int32_t>(WordAt(row, place.at))); });
      out.numbers = gathered.numbers;
      break;
    case 'l':
      gathered.long_numbers.clear();
      for_each([&](size_t row) {
        int64_t number;
        std::memcpy(&number, &rows_[row * row_words_ + place.at], sizeof number);
        gathered.long_numbers.push_back(number);
      });
      out.long_numbers = gathered.long_numbers;
      break;
    case 'b':
      GatherBits(place.at, begin, end, gathered.bits);
      out.bits = &gathered.bits;
      break;
    default:
      GatherTexts(column, begin, end, gathered);
      out.places = gathered.places;
      out.dictionary = gathered.dictionary;
  }
  return out;
}

void SortedRun::GatherBits(size_t bit, size_t begin, size_t end, Bits& bits) const {
  bits = Bits();
  for (size_t row = begin; row < end; ++row) bits.Add(BitAt(row, bit));
}

void SortedRun::GatherTexts(size_t column, size_t begin, size_t end, Gathered& gathered) {
  const bool may_be_missing = buffers_[column].validity != nullptr;
  const Place at = layout_[column];
  gathered.places.resize(end - begin);
  uint32_t* out = gathered.places.data();
  std::vector<uint32_t> used;
  for (size_t row = begin; row < end; ++row) {
    if (may_be_missing && !BitAt(row, at.validity)) continue;
    const uint32_t number = WordAt(row, at.at);
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
    gathered.dictionary.push_back(TextOf(buffers_[column].dictionary, number));
    places_[number] = kNoPlace;
  }
}

}  // namespace quillet
