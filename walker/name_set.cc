// Finding a name among those of one statement.
//
// The key of a name holds all of it up to eight bytes, and its first and last eight mixed above
// that, so for short names equal keys and lengths are equal names. The names a.b, a.b.c, a.b.c.d of
// one chain differ in length and thus never share a key. The slots are filled when the twelfth name
// arrives; a stamp tells slots of this walk from those of earlier ones.

#include "walker/name_set.h"

#include <cstring>

namespace quillet {
namespace {

uint64_t Load64(const char* at) {
  uint64_t value;
  std::memcpy(&value, at, sizeof value);
  return value;
}

uint32_t Load32(const char* at) {
  uint32_t value;
  std::memcpy(&value, at, sizeof value);
  return value;
}

uint64_t KeyOf(Text name) {
  const char* const at = name.data();
  const size_t size = name.size();
  if (size >= 8) return Load64(at) ^ (Load64(at + size - 8) * 0x9E3779B97F4A7C15u) ^ size;
  if (size >= 4) return uint64_t{Load32(at)} << 32 | Load32(at + size - 4);
  if (size == 0) return 0;
  const auto byte_at = [at](size_t i) { return uint64_t{static_cast<unsigned char>(at[i])}; };
  return byte_at(0) << 16 | byte_at(size >> 1) << 8 | byte_at(size - 1);
}

// Whether two names of equal keys are one.
bool SameName(Text kept, Text name, Text known_prefix) {
  if (kept.size() != name.size()) return false;
  if (name.size() < 8) return true;
  // The kept name goes on from the very bytes that the prefix was found at.
  const size_t known = kept.data() == known_prefix.data() ? known_prefix.size() : 0;
  return std::memcmp(kept.data() + known, name.data() + known, name.size() - known) == 0;
}

size_t SlotOf(uint64_t key, size_t slot_count) { return (key * 0x9E3779B97F4A7C15u >> 32) & (slot_count - 1); }

}  // namespace

NameSet::Place NameSet::Add(Text name, Text known_prefix) {
  const uint64_t key = KeyOf(name);
  if (!hashed_) {
    const size_t count = names_.size();
    for (size_t i = 0; i < count; ++i) {
      if (keys_[i] == key && SameName(names_[i], name, known_prefix)) return {i, false};
    }
    if (count + 1 >= kHashFrom) FillSlots(slots_.size() < 4 * kHashFrom ? 64 : slots_.size());
    if (!hashed_) return {Append(name, key), true};
  } else if (2 * (names_.size() + 1) > slots_.size()) {
    FillSlots(2 * slots_.size());
  }
  for (size_t at = SlotOf(key, slots_.size());; at = (at + 1) & (slots_.size() - 1)) {
    Slot& slot = slots_[at];
    if (slot.generation != generation_) {
      slot = {generation_, static_cast<uint32_t>(names_.size())};
      return {Append(name, key), true};
    }
    if (keys_[slot.index] == key && SameName(names_[slot.index], name, known_prefix)) return {slot.index, false};
  }
}

size_t NameSet::Append(Text name, uint64_t key) {
  names_.push_back(name);
  keys_.push_back(key);
  return names_.size() - 1;
}

void NameSet::FillSlots(size_t slot_count) {
  if (slot_count != slots_.size()) slots_.assign(slot_count, Slot());
  // A wrapped stamp would take old slots for new ones.
  if (++generation_ == 0) {
    slots_.assign(slot_count, Slot());
    generation_ = 1;
  }
  for (uint32_t index = 0; index < names_.size(); ++index) {
    size_t at = SlotOf(keys_[index], slot_count);
    while (slots_[at].generation == generation_) at = (at + 1) & (slot_count - 1);
    slots_[at] = {generation_, index};
  }
  hashed_ = true;
}

void NameSet::Clear() {
  names_.clear();
  keys_.clear();
  hashed_ = false;
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

void StoreList::Clear() {
  names_.Clear();
  chains_.clear();
  stores_.clear();
}

}  // namespace quillet
