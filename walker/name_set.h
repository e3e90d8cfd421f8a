// The names that a walk collects: reads, each once, and stores inside sub-expressions, grouped by
// name, both in order of first arrival.
//
// Names are views (of the source, or of the line's arena). Few names are compared one by one; from
// kHashFrom on a table of slots finds them, kept across walks and emptied by a generation stamp.
#pragma once

#include <cstdint>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class NameSet {
 public:
  static constexpr size_t kHashFrom = 12;

  // Index of the name; `added` tells whether it is new.
  size_t Add(Text name, bool& added);
  bool Add(Text name) {
    bool added;
    Add(name, added);
    return added;
  }
  const std::vector<Text>& names() const { return names_; }
  bool empty() const { return names_.empty(); }
  void Clear();

 private:
  struct Slot {
    uint32_t generation = 0;
    uint32_t index = 0;
  };
  void Rehash(size_t slot_count);

  std::vector<Text> names_;
  std::vector<Slot> slots_;
  uint32_t generation_ = 1;
};

// Stores by name: for each name the token indices (as info texts, in the walker's arena) of its
// stores, in order.
struct StoreList {
  NameSet names;
  std::vector<std::vector<int32_t>> places;  // by index of the name; reused

  void Add(Text name, int32_t place);
  void Clear() { names.Clear(); }
};

}  // namespace quillet
