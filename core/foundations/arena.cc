// Blocks of a text arena: kept ones are used again in order, new ones double in size.
#include "foundations/arena.h"

#include <algorithm>

namespace quillet {

namespace {
constexpr size_t kFirstBlockSize = size_t{4} << 10;
// Past this size doubling gains nothing and wastes up to half of what it takes.
constexpr size_t kLargestBlockSize = size_t{1} << 20;
}  // namespace

void TextArena::Enter(size_t block) {
  current_ = block;
  next_ = blocks_[block].bytes.get();
  end_ = next_ + blocks_[block].size;
}

void TextArena::AddBlock(size_t at_least) {
  // Blocks behind the current one were kept by Reset. One that is too small for this text is passed
  // over until the next Reset.
  size_t following = next_ == nullptr ? 0 : current_ + 1;
  while (following < blocks_.size() && blocks_[following].size < at_least) ++following;
  if (following == blocks_.size()) {
    const size_t doubled =
        blocks_.empty() ? kFirstBlockSize : std::clamp(blocks_.back().size * 2, kFirstBlockSize, kLargestBlockSize);
    const size_t size = std::max(doubled, at_least);
    blocks_.push_back({std::unique_ptr<char[]>(new char[size]), size});
    byte_size_ += size;
  }
  Enter(following);
}

void TextArena::Reset() {
  if (!blocks_.empty()) Enter(0);
}

}  // namespace quillet
