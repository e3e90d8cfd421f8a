// The text of a chain such as a.b(c).d while a walk goes along it, link by link.
//
// As long as the tokens stand side by side in the source it is a view of the source. Then it is
// composed in an arena, in place: the text of each link is the beginning of the next one's, so all
// links share their bytes and a chain of any length takes memory in proportion to itself.
#pragma once

#include <cstring>

#include "foundations/arena.h"
#include "foundations/text.h"

namespace quillet {

class ChainText {
 public:
  // A text that outlives the chain.
  void StartWithView(Text text) {
    data_ = const_cast<char*>(text.data());
    size_ = text.size();
    capacity_ = 0;
  }
  // Any text.
  void StartWithCopy(Text text, TextArena& arena) {
    StartWithView(text);
    Grow(0, arena);
  }
  void Append(Text piece, TextArena& arena) {
    if (capacity_ == 0 && data_ + size_ == piece.data()) {
      size_ += piece.size();
      return;
    }
    if (size_ + piece.size() > capacity_) Grow(piece.size(), arena);
    std::memcpy(data_ + size_, piece.data(), piece.size());
    size_ += piece.size();
  }

  Text text() const { return {data_, size_}; }
  // Whether the text was put together in the arena.
  bool composed() const { return capacity_ != 0; }

 private:
  // Leaves the bytes where they are: earlier links refer to them.
  void Grow(size_t more, TextArena& arena) {
    capacity_ = 2 * (size_ + more) + 16;
    char* data = arena.Allocate(capacity_);
    std::memcpy(data, data_, size_);
    data_ = data;
  }

  char* data_ = nullptr;
  size_t size_ = 0;
  size_t capacity_ = 0;  // 0: a view
};

}  // namespace quillet
