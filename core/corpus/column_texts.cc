// Memory grows by doubling, and stays for the texts of the next run of rows.
#include "corpus/column_texts.h"

#include <algorithm>

#include "foundations/errors.h"

namespace quillet {

namespace {

constexpr size_t kFirstSlots = size_t{1} << 10;
constexpr size_t kFirstBytes = size_t{1} << 14;
// What more than this was needed for is not kept.
constexpr size_t kMostKeptBytes = size_t{32} << 20;

}  // namespace

void ColumnTexts::Clear() {
  if (capacity_ > kMostKeptBytes) {
    bytes_.reset();
    capacity_ = 0;
  }
  begins_.resize(1);
  // As many slots as the texts before needed: those of a run are much like those of the one before it.
  SetSlots(std::max(kFirstSlots, slots_.size()));
  if (capacity_ == 0) Reserve(kFirstBytes);
}

void ColumnTexts::SetSlots(size_t count) {
  slots_.assign(count, Slot{0, kNoNumber});
  mask_ = count - 1;
  for (uint32_t number = 0; number < size(); ++number) {
    const Asked asked(TextOf(number));
    size_t at = asked.hash & mask_;
    while (slots_[at].number != kNoNumber) at = (at + 1) & mask_;
    slots_[at] = {static_cast<uint32_t>(asked.hash >> 32), number};
  }
}

void ColumnTexts::Reserve(size_t capacity) {
  auto bytes = std::make_unique_for_overwrite<char[]>(capacity + kSlack);
  if (bytes_ != nullptr) std::memcpy(bytes.get(), bytes_.get(), byte_size());
  bytes_ = std::move(bytes);
  capacity_ = capacity;
}

uint32_t ColumnTexts::Add(const Asked& asked, size_t slot) {
  const size_t begin = byte_size();
  const size_t end = begin + kLengthSize + asked.text.size();
  if (end > UINT32_MAX) ThrowError(ErrorKind::kRuntimeError, "a column has too much text");
  if (end > capacity_) Reserve(std::max(end, 2 * capacity_));
  const auto number = static_cast<uint32_t>(size());
  const auto length = static_cast<uint32_t>(asked.text.size());
  std::memcpy(bytes_.get() + begin, &length, kLengthSize);
  asked.text.copy(bytes_.get() + begin + kLengthSize, length);
  begins_.push_back(static_cast<uint32_t>(end));
  slots_[slot] = {static_cast<uint32_t>(asked.hash >> 32), number};
  if (2 * size() > mask_) SetSlots(2 * slots_.size());
  return number;
}

}  // namespace quillet
