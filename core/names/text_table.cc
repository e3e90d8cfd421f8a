// The table takes as many slots as the file needs: memory of a large one is kept, and not swept for
// each small one behind it.
#include "names/text_table.h"

#include <algorithm>
#include <bit>

namespace quillet {

namespace {

uint32_t FormOf(Text text) {
  uint32_t form = TextTable::kPlain;
  if (text.starts_with("__") && !text.ends_with("__")) form |= TextTable::kPrivate;
  if (text == "super") form |= TextTable::kSuper;
  if (std::any_of(text.begin(), text.end(), [](char c) { return static_cast<unsigned char>(c) >= 0x80; }))
    form |= TextTable::kNotAscii;
  return form;
}

}  // namespace

void TextTable::Begin(size_t expected) {
  entries_.clear();
  copies_.Reset();
  const size_t count = std::bit_ceil(std::max<size_t>(2 * expected, 64));
  if (slots_.size() < count) slots_.resize(count);
  std::fill_n(slots_.begin(), count, Slot{0, kNoIndex});
  mask_ = count - 1;
}

uint32_t TextTable::NumberOfCopy(Text text) {
  const size_t count = entries_.size();
  const uint32_t number = NumberOf(text);
  if (entries_.size() != count) entries_[number].data = copies_.Copy(text).data();
  return number;
}

uint32_t TextTable::Add(Text text, TextKey key, uint64_t hash, size_t slot) {
  const auto number = static_cast<uint32_t>(entries_.size());
  entries_.push_back(
      {key.first, key.last, text.data(), static_cast<uint32_t>(text.size()), FormOf(text), kNoIndex, kNoIndex});
  slots_[slot] = {static_cast<uint32_t>(hash >> 32), number};
  if (2 * entries_.size() > mask_) Grow();
  return number;
}

void TextTable::Grow() {
  const size_t count = 2 * (mask_ + 1);
  if (slots_.size() < count) slots_.resize(count);
  std::fill_n(slots_.begin(), count, Slot{0, kNoIndex});
  mask_ = count - 1;
  for (uint32_t number = 0; number < entries_.size(); ++number) {
    const uint64_t hash = TextKey{entries_[number].first, entries_[number].last}.HashOf(TextOf(number));
    size_t at = hash & mask_;
    while (slots_[at].number != kNoIndex) at = (at + 1) & mask_;
    slots_[at] = {static_cast<uint32_t>(hash >> 32), number};
  }
}

void TextTable::CopyTo(TextList& texts) const {
  texts.offsets.resize(1);
  texts.bytes.clear();
  texts.offsets.reserve(entries_.size() + 1);
  for (uint32_t number = 0; number < entries_.size(); ++number) texts.Add(TextOf(number));
}

}  // namespace quillet
