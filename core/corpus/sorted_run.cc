#include "corpus/sorted_run.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace quillet {

namespace {

constexpr uint32_t kNoPlace = UINT32_MAX;
constexpr size_t kFetchedAhead = 16;

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

}  // namespace

SortedRun::SortedRun(const RowTable& table, size_t key)
    : table_(table), key_(key), schema_(table.Schema()), buffers_(table.Buffers()) {
  size_t most_texts = 0;
  for (const ColumnBuffers& column : buffers_) most_texts = std::max(most_texts, column.dictionary.size);
  places_.assign(most_texts, kNoPlace);
  LayOut();
  Sort();
}

void SortedRun::LayOut() {
  size_t bits = 0;
  for (size_t i = 0; i < schema_.size(); ++i) {
    Place& place = layout_.emplace_back();
    if (schema_[i].format == "b") place.at = bits++;
    const Bits* const validity = buffers_[i].validity;
    is_missing_.push_back(validity != nullptr && validity->false_count() == table_.size());
    if (validity != nullptr && !is_missing_.back()) place.validity = bits++;
  }
  row_words_ = (bits + 31) / 32;
  for (const bool is_long : {false, true}) {
    for (size_t i = 0; i < schema_.size(); ++i) {
      if (schema_[i].format == "b" || (schema_[i].format == "l") != is_long) continue;
      layout_[i].at = row_words_;
      row_words_ += is_long ? 2 : 1;
    }
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

  // What is copied into a row: bits, and behind them words, those of long numbers last.
  struct BitSource {
    const uint8_t* bytes;
    size_t bit;
  };
  std::vector<BitSource> bits;  // in the order of their places
  std::vector<const uint32_t*> words;
  std::vector<const uint64_t*> long_words;
  for (size_t i = 0; i < schema_.size(); ++i) {
    const void* const values = buffers_[i].values[0];
    if (schema_[i].format == "b")
      bits.push_back({static_cast<const uint8_t*>(values), layout_[i].at});
    else if (schema_[i].format == "l")
      long_words.push_back(static_cast<const uint64_t*>(values));
    else
      words.push_back(static_cast<const uint32_t*>(values));
    if (layout_[i].validity != kNone)
      bits.push_back({static_cast<const uint8_t*>(buffers_[i].validity->data()), layout_[i].validity});
  }
  const size_t bit_words = row_words_ - words.size() - 2 * long_words.size();
  rows_ = std::make_unique_for_overwrite<uint32_t[]>(size * row_words_);
  for (size_t row = 0; row < size; ++row) {
    // Rows go all over the table: where the next ones go is fetched by then.
    if (row + kFetchedAhead < size)
      __builtin_prefetch(rows_.get() + next[keys[row + kFetchedAhead]] * row_words_, /*to be written*/ 1);
    uint32_t* out = rows_.get() + next[keys[row]]++ * row_words_;
    const BitSource* source = bits.data();
    for (size_t end = 32; end <= 32 * bit_words; end += 32) {
      uint32_t word = 0;
      for (; source < bits.data() + bits.size() && source->bit < end; ++source)
        word |= (source->bytes[row / 8] >> row % 8 & 1u) << source->bit % 32;
      *out++ = word;
    }
    for (const uint32_t* const from : words) *out++ = from[row];
    for (const uint64_t* const from : long_words) {
      std::memcpy(out, from + row, sizeof *from);
      out += 2;
    }
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
  const Place place = layout_[column];
  if (is_missing_[column]) {
    gathered.validity = Bits();
    gathered.validity.Add(false, end - begin);
    out.validity = &gathered.validity;
    return out;
  }
  if (place.validity != kNone) {
    GatherBits(place.validity, begin, end, gathered.validity);
    out.validity = &gathered.validity;
  }
  switch (schema_[column].format[0]) {
    case 'i':
      gathered.numbers.resize(end - begin);
      gathered.numbers.resize(ForEachValue(
          place, begin, end,
          [to = gathered.numbers.data()](size_t i, const uint32_t* at) { to[i] = static_cast<int32_t>(*at); }));
      out.numbers = gathered.numbers;
      break;
    case 'l':
      gathered.long_numbers.resize(end - begin);
      gathered.long_numbers.resize(ForEachValue(
          place, begin, end,
          [to = gathered.long_numbers.data()](size_t i, const uint32_t* at) { std::memcpy(to + i, at, sizeof *to); }));
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

template <class Take>
size_t SortedRun::ForEachValue(Place place, size_t begin, size_t end, const Take& take) const {
  const size_t step = row_words_;
  const uint32_t* at = rows_.get() + begin * step + place.at;
  if (place.validity == kNone) {
    for (size_t i = 0; i < end - begin; ++i, at += step) take(i, at);
    return end - begin;
  }
  size_t count = 0;
  for (size_t row = begin; row < end; ++row, at += step) {
    if (BitAt(row, place.validity)) take(count++, at);
  }
  return count;
}

void SortedRun::GatherBits(size_t bit, size_t begin, size_t end, Bits& bits) const {
  bits.Assign(end - begin, [&](size_t i) { return BitAt(begin + i, bit); });
}

void SortedRun::GatherTexts(size_t column, size_t begin, size_t end, Gathered& gathered) {
  std::vector<uint32_t> used;
  gathered.places.resize(end - begin);
  const size_t count =
      ForEachValue(layout_[column], begin, end,
                   [to = gathered.places.data(), places = places_.data(), &used](size_t i, const uint32_t* at) {
                     uint32_t& place = places[*at];
                     if (place == kNoPlace) [[unlikely]] {
                       place = static_cast<uint32_t>(used.size());
                       used.push_back(*at);
                     }
                     to[i] = place;
                   });
  gathered.places.resize(count);
  gathered.dictionary.clear();
  for (const uint32_t number : used) {
    gathered.dictionary.push_back(TextOf(buffers_[column].dictionary, number));
    places_[number] = kNoPlace;
  }
}

}  // namespace quillet
