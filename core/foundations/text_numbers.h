// Numbers for texts: equal texts have one number, in order of first arrival.
//
// The texts stay where they stand. Slots are kept from one use to the next, but for those of a huge one, and only as
// many as are expected to be needed are emptied, so that a large file does not slow down the small ones behind it.
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class TextNumbers {
 public:
  // Drops all texts; about `expected` ones will come, and are not taken at their word where that is many.
  void Begin(size_t expected) {
    count_ = 0;
    if (slots_.size() > kMostKept) slots_ = std::vector<Slot>(kFewestSlots);
    Empty(std::bit_ceil(std::clamp(2 * expected, kFewestSlots, kMostAtFirst)));
  }

  // The number of a text, which stands until the next Begin.
  uint32_t NumberOf(Text text) {
    const uint64_t hash = HashOf(text);
    const auto tag = static_cast<uint32_t>(hash >> 32);
    size_t at = hash & mask_;
    for (; slots_[at].number != kEmpty; at = (at + 1) & mask_) {
      const Slot& slot = slots_[at];
      if (slot.tag == tag && Text(slot.data, slot.size) == text) return slot.number;
    }
    slots_[at] = {text.data(), static_cast<uint32_t>(text.size()), tag, count_};
    if (2 * size_t{++count_} > mask_) Grow();
    return count_ - 1;
  }

  // How many texts have a number.
  uint32_t size() const { return count_; }

 private:
  static constexpr uint32_t kEmpty = UINT32_MAX;
  static constexpr size_t kFewestSlots = 64;
  static constexpr size_t kMostAtFirst = size_t{1} << 13;
  static constexpr size_t kMostKept = size_t{1} << 18;

  struct Slot {
    const char* data = nullptr;
    uint32_t size = 0;
    uint32_t tag = 0;  // of the hash
    uint32_t number = kEmpty;
  };

  static uint64_t Mixed(uint64_t hash, uint64_t word) {
    const uint64_t product = (hash ^ word) * 0x9E3779B97F4A7C15u;
    return product ^ product >> 32;
  }
  static uint64_t HashOf(Text text) {
    uint64_t hash = text.size();
    const char* at = text.data();
    size_t left = text.size();
    uint64_t word;
    for (; left >= sizeof word; left -= sizeof word, at += sizeof word) {
      std::memcpy(&word, at, sizeof word);
      hash = Mixed(hash, word);
    }
    word = 0;
    if (left != 0) std::memcpy(&word, at, left);
    return Mixed(Mixed(hash, word), 0);
  }

  void Empty(size_t slot_count) {
    if (slots_.size() < slot_count) slots_.resize(slot_count);
    std::fill_n(slots_.begin(), slot_count, Slot());
    mask_ = slot_count - 1;
  }

  void Grow() {
    const std::vector<Slot> before(slots_.begin(), slots_.begin() + static_cast<ptrdiff_t>(mask_ + 1));
    Empty(2 * before.size());
    for (const Slot& slot : before) {
      if (slot.number == kEmpty) continue;
      size_t at = HashOf({slot.data, slot.size}) & mask_;
      while (slots_[at].number != kEmpty) at = (at + 1) & mask_;
      slots_[at] = slot;
    }
  }

  std::vector<Slot> slots_ = std::vector<Slot>(kFewestSlots);
  size_t mask_ = kFewestSlots - 1;  // of the slots in use, which may be fewer than there are
  uint32_t count_ = 0;
};

}  // namespace quillet
