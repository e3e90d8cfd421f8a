// Numbers for texts: equal texts of a file have one number, in order of first arrival.
//
// A text of up to 16 bytes is told from all others by two words and its length, so that nearly every
// look-up compares numbers and touches no bytes. Beside each text stand what a symbol of that name
// needs to know and the symbol that was asked for last: in a scope a name is asked for again and again.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundations/arena.h"
#include "foundations/text.h"
#include "foundations/text_key.h"
#include "names/bindings.h"

namespace quillet {

class TextTable {
 public:
  // What is special about a name; none for most.
  enum Form : uint32_t {
    kPlain = 0,
    kPrivate = 1,   // begins with two underscores and does not end with two
    kNotAscii = 2,  // its normal form may be another
    kSuper = 4,     // the word "super"
  };

  struct Entry {
    uint64_t first, last;  // the key: the bytes at both ends
    const char* data;
    uint32_t size;
    uint32_t form;        // bits of Form
    uint32_t last_scope;  // the scope and the symbol that were asked for last
    uint32_t last_symbol;
  };

  // For another file, of about so many names.
  void Begin(size_t expected);

  // The number of a text that stands until the next Begin.
  uint32_t NumberOf(Text text) {
    const TextKey key = TextKey::Of(text);
    const uint64_t hash = key.HashOf(text);
    const auto tag = static_cast<uint32_t>(hash >> 32);
    for (size_t at = hash & mask_;; at = (at + 1) & mask_) {
      const Slot slot = slots_[at];
      if (slot.number == kNoIndex) return Add(text, key, hash, at);
      if (slot.tag == tag && Same(entries_[slot.number], text, key)) return slot.number;
    }
  }
  // kNoIndex for a text that is not there.
  uint32_t Find(Text text) const {
    const TextKey key = TextKey::Of(text);
    const uint64_t hash = key.HashOf(text);
    for (size_t at = hash & mask_; slots_[at].number != kNoIndex; at = (at + 1) & mask_) {
      if (Same(entries_[slots_[at].number], text, key)) return slots_[at].number;
    }
    return kNoIndex;
  }
  // NumberOf for a text that does not stand so long.
  uint32_t NumberOfCopy(Text text);

  size_t size() const { return entries_.size(); }
  Entry& operator[](uint32_t number) { return entries_[number]; }
  const Entry& operator[](uint32_t number) const { return entries_[number]; }
  Text TextOf(uint32_t number) const { return {entries_[number].data, entries_[number].size}; }

  // All texts, in the order of their numbers.
  void CopyTo(TextList& texts) const;

 private:
  struct Slot {
    uint32_t tag;
    uint32_t number;  // kNoIndex in an empty slot
  };

  static bool Same(const Entry& entry, Text text, TextKey key) {
    if (entry.first != key.first || entry.last != key.last || entry.size != text.size()) return false;
    return TextKey::AreSameInside({entry.data, entry.size}, text);
  }

  uint32_t Add(Text text, TextKey key, uint64_t hash, size_t slot);
  void Grow();

  std::vector<Entry> entries_;
  std::vector<Slot> slots_;
  size_t mask_ = 0;  // of the slots in use, which may be fewer than there are
  TextArena copies_;
};

}  // namespace quillet
