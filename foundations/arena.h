// A bump allocator for text that lives as long as a file's or a line's records.
//
// Memory comes in blocks that double up to a bound, is handed out front to back and taken back all
// at once; Reset keeps the blocks for the next file.
#pragma once

#include <cstddef>
#include <cstring>
#include <memory>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class TextArena {
 public:
  TextArena() = default;
  TextArena(const TextArena&) = delete;
  TextArena& operator=(const TextArena&) = delete;
  TextArena(TextArena&&) = default;
  TextArena& operator=(TextArena&&) = default;

  // Bytes without content; valid until Reset or the arena's end.
  char* Allocate(size_t size) {
    if (size > static_cast<size_t>(end_ - next_)) [[unlikely]] AddBlock(size);
    char* result = next_;
    next_ += size;
    return result;
  }

  Text Copy(Text text) {
    char* bytes = Allocate(text.size());
    if (!text.empty()) std::memcpy(bytes, text.data(), text.size());
    return {bytes, text.size()};
  }

  void Reset();

 private:
  void AddBlock(size_t at_least);

  struct Block {
    std::unique_ptr<char[]> bytes;
    size_t size;
  };

  char* next_ = nullptr;
  char* end_ = nullptr;
  size_t current_ = 0;  // index of the block in use
  std::vector<Block> blocks_;
};

}  // namespace quillet
