// A bump allocator for text that lives as long as a file's or a line's records.
//
// Memory comes in blocks that double up to a bound, is handed out front to back and taken back all
// at once; Reset keeps the blocks for the next file.
#pragma once

#include <cstddef>
#include <cstring>
#include <memory>
#include <utility>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class TextArena {
 public:
  static constexpr size_t kSlack = 16;

  TextArena() = default;
  TextArena(const TextArena&) = delete;
  TextArena& operator=(const TextArena&) = delete;
  TextArena(TextArena&& other) noexcept { *this = std::move(other); }
  TextArena& operator=(TextArena&& other) noexcept {
    next_ = std::exchange(other.next_, nullptr);
    end_ = std::exchange(other.end_, nullptr);
    current_ = std::exchange(other.current_, 0);
    blocks_ = std::exchange(other.blocks_, {});
    byte_size_ = std::exchange(other.byte_size_, 0);
    return *this;
  }

  // Bytes without content; valid until Reset or the arena's end.
  char* Allocate(size_t size) {
    if (size > static_cast<size_t>(end_ - next_)) [[unlikely]]
      AddBlock(size);
    char* result = next_;
    next_ += size;
    return result;
  }

  // The same, with kSlack bytes behind them that may be written until the next call.
  char* AllocateWithSlack(size_t size) {
    if (size + kSlack > static_cast<size_t>(end_ - next_)) [[unlikely]]
      AddBlock(size + kSlack);
    return Allocate(size);
  }

  // Empty text stays apart from none: a copy has data unless the original had none.
  Text Copy(Text text) {
    if (text.empty()) return IsNone(text) ? kNoText : Text("");
    char* bytes = Allocate(text.size());
    std::memcpy(bytes, text.data(), text.size());
    return {bytes, text.size()};
  }

  void Reset();

  // What its blocks take, those kept by Reset included.
  size_t byte_size() const { return byte_size_; }

 private:
  void AddBlock(size_t at_least);
  void Enter(size_t block);

  struct Block {
    std::unique_ptr<char[]> bytes;
    size_t size;
  };

  char* next_ = nullptr;
  char* end_ = nullptr;
  size_t current_ = 0;  // index of the block in use, where there are any
  size_t byte_size_ = 0;
  std::vector<Block> blocks_;
};

}  // namespace quillet
