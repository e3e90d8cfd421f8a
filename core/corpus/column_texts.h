// The texts of a column, each once, as the page of a Parquet dictionary has them: one behind the other, each behind its
// length. Equal texts have one number, in order of first arrival.
//
// A table of texts is asked for each row and is larger than the caches next to the processor. So a look-up touches a
// slot, a place and the text, which may be fetched ahead, and what is kept of a text is little more than itself.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

#include "foundations/text.h"
#include "foundations/text_key.h"

namespace quillet {

class ColumnTexts {
 public:
  // Bytes that may be read behind the last text.
  static constexpr size_t kSlack = 32;

  ColumnTexts() { Clear(); }

  // For other texts. The memory is kept, unless it was taken for uncommonly much.
  void Clear();

  // A text that is looked up, and its hash, which is asked for several times.
  struct Asked {
    Text text;
    TextKey key;
    uint64_t hash;

    explicit Asked(Text it = {}) : text(it), key(TextKey::Of(it)), hash(key.HashOf(it)) {}
  };

  uint32_t NumberOf(const Asked& asked) {
    const auto tag = static_cast<uint32_t>(asked.hash >> 32);
    for (size_t at = asked.hash & mask_;; at = (at + 1) & mask_) {
      const Slot slot = slots_[at];
      if (slot.number == kNoNumber) return Add(asked, at);
      if (slot.tag == tag && IsSame(TextOf(slot.number), asked)) return slot.number;
    }
  }
  uint32_t NumberOf(Text text) { return NumberOf(Asked(text)); }
  // For texts that are asked for soon: has their slots fetched, then what these lead to.
  void FetchSlot(const Asked& asked) const { __builtin_prefetch(&slots_[asked.hash & mask_]); }
  void FetchText(const Asked& asked) const {
    const uint32_t number = slots_[asked.hash & mask_].number;
    if (number != kNoNumber) __builtin_prefetch(bytes_.get() + begins_[number]);
  }

  size_t size() const { return begins_.size() - 1; }
  // Lengths included.
  size_t byte_size() const { return begins_.back(); }
  Text TextOf(uint32_t number) const {
    const char* const at = bytes_.get() + begins_[number];
    return {at + kLengthSize, begins_[number + 1] - begins_[number] - kLengthSize};
  }
  // The texts from one number to another, each behind its length.
  Text Page(uint32_t begin, uint32_t end) const {
    return {bytes_.get() + begins_[begin], begins_[end] - begins_[begin]};
  }

 private:
  static constexpr uint32_t kNoNumber = UINT32_MAX;
  static constexpr size_t kLengthSize = 4;
  struct Slot {
    uint32_t tag;
    uint32_t number;  // kNoNumber in an empty slot
  };

  static bool IsSame(Text text, const Asked& asked) {
    return text.size() == asked.text.size() && TextKey::Of(text) == asked.key &&
           TextKey::AreSameInside(text, asked.text);
  }
  uint32_t Add(const Asked& asked, size_t slot);
  void SetSlots(size_t count);
  void Reserve(size_t capacity);

  std::vector<Slot> slots_;
  size_t mask_ = 0;
  std::vector<uint32_t> begins_ = {0};  // of each text, and of the one that comes next
  std::unique_ptr<char[]> bytes_;
  size_t capacity_ = 0;
};

}  // namespace quillet
