// The names that a walk collects: reads, each once, and stores inside sub-expressions, grouped by
// name, both in order of first arrival.
//
// Names are views, which the caller keeps alive. Each has a 64-bit key made of its ends and its
// length, so that telling two names apart costs one comparison whatever their length. Few names are
// compared one by one; from kHashFrom on a table of slots finds them, kept across walks and emptied
// by a generation stamp.
#pragma once

#include <cstdint>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class NameSet {
 public:
  static constexpr size_t kHashFrom = 12;

  struct Place {
    size_t index;
    bool added;
  };

  // Where the name stands; a new one is kept as given. `known_prefix`, where there is one, is the
  // beginning of `name` as an earlier Add found it here: a link of a chain a.b.c is compared with
  // what it adds to the link in front of it, and not over and over as a whole.
  Place Add(Text name, Text known_prefix = kNoText);
  // Puts a copy of equal content in the place of a name.
  void Replace(size_t index, Text copy) { names_[index] = copy; }

  const std::vector<Text>& names() const { return names_; }
  bool empty() const { return names_.empty(); }
  void Clear();

 private:
  struct Slot {
    uint32_t generation = 0;
    uint32_t index = 0;
  };
  void FillSlots(size_t slot_count);
  size_t Append(Text name, uint64_t key);

  std::vector<Text> names_;
  std::vector<uint64_t> keys_;
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

  const std::vector<Text>& names() const { return names_.names(); }
  // The first store of the name at `index`; follow `next` for the others.
  const Store& first(size_t index) const { return stores_[chains_[index].first]; }
  const Store& at(uint32_t next) const { return stores_[next]; }
  bool empty() const { return names_.empty(); }
  void Clear();

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
