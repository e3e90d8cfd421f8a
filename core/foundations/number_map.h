// A map from numbers to small values that is asked far more often than anything else is done with it: one array,
// looked through from where a number belongs until a free place.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace quillet {

// Numbers are 64 bits wide and not 0. Values are copied.
template <class T>
class NumberMap {
 public:
  // nullptr without one; until something is put.
  const T* Find(uint64_t number) const {
    if (slots_.empty()) return nullptr;
    for (size_t at = Begin(number);; at = (at + 1) & mask_) {
      if (slots_[at].number == number) return &slots_[at].value;
      if (slots_[at].number == 0) return nullptr;
    }
  }

  // In place of the value that was there.
  void Put(uint64_t number, const T& value) {
    if (2 * (count_ + 1) > slots_.size()) Grow();
    for (size_t at = Begin(number);; at = (at + 1) & mask_) {
      if (slots_[at].number == 0) {
        slots_[at].number = number;
        ++count_;
      } else if (slots_[at].number != number) {
        continue;
      }
      slots_[at].value = value;
      return;
    }
  }

  size_t size() const { return count_; }
  size_t ByteSize() const { return slots_.size() * sizeof(Slot); }
  void Clear() {
    slots_ = {};
    mask_ = count_ = 0;
  }

 private:
  struct Slot {
    uint64_t number = 0;
    T value{};
  };
  static constexpr size_t kFewest = 64;

  size_t Begin(uint64_t number) const {
    number *= 0x9E3779B97F4A7C15;
    return (number ^ (number >> 32)) & mask_;
  }

  void Grow() {
    std::vector<Slot> old(slots_.empty() ? kFewest : slots_.size() * 2);
    old.swap(slots_);
    mask_ = slots_.size() - 1;
    for (const Slot& slot : old) {
      if (slot.number == 0) continue;
      size_t at = Begin(slot.number);
      while (slots_[at].number != 0) at = (at + 1) & mask_;
      slots_[at] = slot;
    }
  }

  std::vector<Slot> slots_;
  size_t mask_ = 0;
  size_t count_ = 0;
};

}  // namespace quillet
