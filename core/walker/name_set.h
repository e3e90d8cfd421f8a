// The names that a walk collects: reads, each once, and stores inside sub-expressions, grouped by
// name, both in order of first arrival.
//
// Names are views, which the caller keeps alive. Each has a 64-bit key made of its ends and its
// length, so that telling two names apart costs one comparison whatever their length. Few names are
// compared one by one; from kHashFrom on a table of slots finds them, kept across walks and emptied
// by a generation stamp.
#pragma once

#include <cstdint>
#include <cstring>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class NameSet {
 public:
  static constexpr size_t kHashFrom = 12;

  struct Name {
    const char* data;
    size_t size;
    uint64_t key;

    Text text() const { return {data, size}; }
  };
  struct Place {
    uint32_t index;
    bool added;
  };

  // Where the name stands; a new one is kept as given. `known_prefix`, where there is one, is the
  // beginning of `name` as an earlier Add found it here: a link of a chain a.b.c is compared with
  // what it adds to the link in front of it, and not over and over as a whole.
  Place Add(Text name, Text known_prefix = kNoText) {
    const uint64_t key = KeyOf(name);
    if (hashed_) [[unlikely]]
      return AddHashed(name, key, known_prefix);
    const auto count = static_cast<uint32_t>(names_.size());
    for (uint32_t i = 0; i < count; ++i) {
      if (names_[i].key == key && Same(names_[i], name, known_prefix)) return {i, false};
    }
    names_.push_back({name.data(), name.size(), key});
    if (count + 1 == kHashFrom) [[unlikely]]
      FillSlots(slots_.empty() ? kFirstSlots : slots_.size());
    return {count, true};
  }
  // Puts a copy of equal content in the place of a name.
  void Replace(size_t index, Text copy) { names_[index].data = copy.data(); }

  size_t size() const { return names_.size(); }
  bool empty() const { return names_.empty(); }
  Text operator[](size_t index) const { return names_[index].text(); }
  const std::vector<Name>& names() const { return names_; }
  void Clear() {
    names_.clear();
    hashed_ = false;
  }

 private:
  struct Slot {
    uint32_t generation = 0;
    uint32_t index = 0;
  };

  static uint64_t Load64(const char* at) {
    uint64_t value;
    std::memcpy(&value, at, sizeof value);
    return value;
  }
  static uint64_t Load32(const char* at) {
    uint32_t value;
    std::memcpy(&value, at, sizeof value);
    return value;
  }
  // All bytes of a name shorter than eight; of any other both ends, mixed with the length.
  static uint64_t KeyOf(Text name) {
    const char* const at = name.data();
    const size_t size = name.size();
    if (size >= 8) return Load64(at) ^ Load64(at + size - 8) * kMultiplier ^ size;
    if (size >= 4) return Load32(at) << 32 | Load32(at + size - 4);
    if (size == 0) return 0;
    const auto byte_at = [at](size_t i) { return uint64_t{static_cast<unsigned char>(at[i])}; };
    return byte_at(0) << 16 | byte_at(size >> 1) << 8 | byte_at(size - 1);
  }
  // Whether two names of equal keys are one.
  static bool Same(const Name& kept, Text name, Text known_prefix) {
    if (kept.size != name.size()) return false;
    return name.size() < 8 || SameBytes(kept, name, known_prefix);
  }
  static bool SameBytes(const Name& kept, Text name, Text known_prefix) {
    // Where the kept name goes on from the very bytes at which the prefix was found, the rest decides.
    const size_t known = kept.data == known_prefix.data() ? known_prefix.size() : 0;
    return std::memcmp(kept.data + known, name.data() + known, name.size() - known) == 0;
  }
  static size_t SlotOf(uint64_t key, size_t slot_count);
  Place AddHashed(Text name, uint64_t key, Text known_prefix);
  void FillSlots(size_t slot_count);

  static constexpr size_t kFirstSlots = 64;  // a power of two, and room for more than kHashFrom names
  static constexpr uint64_t kMultiplier = 0x9E3779B97F4A7C15u;

  std::vector<Name> names_;
  std::vector<Slot> slots_;
  uint32_t generation_ = 1;
  bool hashed_ = false;  // whether the slots hold the names of this walk
};

// Stores by name: for each name the token indices of its stores, in order.
class StoreList {
 public:
  static constexpr uint32_t kEnd = UINT32_MAX;

  struct Store {
    int32_t place;
    uint32_t next;  // the same name's next store, or kEnd
  };

  NameSet::Place Add(Text name, int32_t place);
  void Replace(size_t index, Text copy) { names_.Replace(index, copy); }

  size_t size() const { return names_.size(); }
  bool empty() const { return names_.empty(); }
  Text name(size_t index) const { return names_[index]; }
  // The first store of the name at `index`; follow `next` for the others.
  const Store& first(size_t index) const { return stores_[chains_[index].first]; }
  const Store& at(uint32_t next) const { return stores_[next]; }
  void Clear() {
    if (stores_.empty()) return;
    names_.Clear();
    chains_.clear();
    stores_.clear();
  }

 private:
  struct Chain {
    uint32_t first;
    uint32_t last;
  };

  NameSet names_;
  std::vector<Chain> chains_;  // by index of the name
  std::vector<Store> stores_;
};

}  // namespace quillet
