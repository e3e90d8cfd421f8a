// Which thread is in the middle of using an object that serves one thread at a time.
//
// No lock: it is for callers that are serialised anyway, such as those that hold the interpreter lock, and whose
// turns may come in the middle of one another's operations.
#pragma once

#include <cstdint>

namespace quillet {

class ThreadUse {
 public:
  // An address that no other thread that lives has.
  static const void* ThisThread() {
    static thread_local char place;
    return &place;
  }

  // False, and nothing changed, while another thread than `self`, which is this one, is between its Enter and its
  // Leave.
  bool Enter(const void* self) {
    if (depth_ != 0 && user_ != self) [[unlikely]]
      return false;
    user_ = self;
    ++depth_;
    return true;
  }
  void Leave() { --depth_; }

 private:
  const void* user_ = nullptr;
  uint32_t depth_ = 0;
};

}  // namespace quillet
