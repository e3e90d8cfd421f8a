// The part of the name set that only long statements reach, and the chains of stores.
//
// The slots are filled when the twelfth name arrives, and then name by name; a stamp tells slots of
// this walk from those of earlier ones, so that none need be emptied. The names a.b, a.b.c, a.b.c.d
// of one chain differ in length, which is part of the key, and so spread over the slots.

#include "walker/name_set.h"

namespace quillet {

size_t NameSet::SlotOf(uint64_t key, size_t slot_count) { return (key * kMultiplier >> 32) & (slot_count - 1); }

NameSet::Place NameSet::AddHashed(Text name, uint64_t key, Text known_prefix) {
  if (2 * (names_.size() + 1) > slots_.size()) FillSlots(2 * slots_.size());
  for (size_t at = SlotOf(key, slots_.size());; at = (at + 1) & (slots_.size() - 1)) {
    Slot& slot = slots_[at];
    if (slot.generation != generation_) {
      slot = {generation_, static_cast<uint32_t>(names_.size())};
      names_.push_back({name.data(), name.size(), key});
      return {slot.index, true};
    }
    const Name& kept = names_[slot.index];
    if (kept.key == key && Same(kept, name, known_prefix)) return {slot.index, false};
  }
}

void NameSet::FillSlots(size_t slot_count) {
  if (slot_count != slots_.size()) slots_.assign(slot_count, Slot());
  // A stamp that wrapped would take old slots for new ones.
  if (++generation_ == 0) {
    slots_.assign(slot_count, Slot());
    generation_ = 1;
  }
  for (uint32_t index = 0; index < names_.size(); ++index) {
    size_t at = SlotOf(names_[index].key, slot_count);
    while (slots_[at].generation == generation_) at = (at + 1) & (slot_count - 1);
    slots_[at] = {generation_, index};
  }
  hashed_ = true;
}

NameSet::Place StoreList::Add(Text name, int32_t place) {
  const NameSet::Place found = names_.Add(name);
  const auto store = static_cast<uint32_t>(stores_.size());
  stores_.push_back({place, kEnd});
  if (found.added) {
    chains_.push_back({store, store});
  } else {
    Chain& chain = chains_[found.index];
    stores_[chain.last].next = store;
    chain.last = store;
  }
  return found;
}

}  // namespace quillet
