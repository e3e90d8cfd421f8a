// bytes objects of texts that come again and again.
#pragma once

#include <array>
#include <cstdint>
#include <cstring>

#include "bindings/bindings.h"
#include "bindings/convert.h"

namespace quillet::host {

// bytes objects of record halves. Most infos are a bare prefix and most names occur many times, so
// the latest texts are kept, by a hash of their ends.
class BytesCache {
 public:
  // A new reference.
  PyObject* Get(const char* text, uint32_t length) {
    if (length > kLongest || length == 0) return BytesOf({text, length}).release().ptr();
    PyObject*& slot = slots_[SlotOf(text, length)];
    if (slot != nullptr && PyBytes_GET_SIZE(slot) == static_cast<Py_ssize_t>(length) &&
        std::memcmp(PyBytes_AS_STRING(slot), text, length) == 0) [[likely]]
      return Py_NewRef(slot);
    PyObject* made = BytesOf({text, length}).release().ptr();
    Py_XSETREF(slot, Py_NewRef(made));
    return made;
  }

 private:
  static constexpr uint32_t kLongest = 40;
  static constexpr int kSlotBits = 12;

  template <class Word>
  static uint64_t Load(const char* at) {
    Word word;
    std::memcpy(&word, at, sizeof word);
    return word;
  }
  static size_t SlotOf(const char* text, uint32_t length) {
    uint64_t ends;
    if (length >= 8) {
      ends = Load<uint64_t>(text) ^ (Load<uint64_t>(text + length - 8) * 31);
    } else if (length >= 4) {
      ends = Load<uint32_t>(text) << 32 | Load<uint32_t>(text + length - 4);
    } else {
      ends = Load<uint8_t>(text) << 16 | Load<uint8_t>(text + length / 2) << 8 | Load<uint8_t>(text + length - 1);
    }
    return static_cast<size_t>(((ends ^ length) * 0x9E3779B97F4A7C15u) >> (64 - kSlotBits));
  }

  std::array<PyObject*, size_t{1} << kSlotBits> slots_{};
};

}  // namespace quillet::host
