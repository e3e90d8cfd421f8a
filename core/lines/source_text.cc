// The bytes of a source in memory of its own, and the way from a place in them to line and column.
//
// A line is found by bisection over the line starts. From a line known to stand in front of the
// place the search gallops, so that it costs nothing for the statements of one line that make up
// most sources and stays logarithmic for a table of a million lines.
#include "lines/source_text.h"

#include <algorithm>
#include <cstring>

namespace quillet {

Ref<SourceText> SourceText::Copy(Text bytes) {
  Ref<SourceText> source(new SourceText);
  source->Assign(bytes);
  return source;
}

Ref<SourceText> SourceText::Within(Ref<SourceText> outer) {
  Ref<SourceText> source(new SourceText);
  source->begin_ = outer->begin_;
  source->size_ = outer->size_;
  source->outer_ = outer->outer_ ? outer->outer_ : std::move(outer);
  return source;
}

void SourceText::Assign(Text bytes) {
  bytes = bytes.substr(0, kMaxSize);
  tokens.clear();
  line_starts.clear();
  outer_ = {};
  if (bytes.size() + kPadding > capacity_) {
    capacity_ = 0;
    buffer_.reset(new char[bytes.size() + kPadding]);
    capacity_ = bytes.size() + kPadding;
  }
  if (!bytes.empty()) std::memcpy(buffer_.get(), bytes.data(), bytes.size());
  std::memset(buffer_.get() + bytes.size(), 0, kPadding);
  begin_ = buffer_.get();
  size_ = bytes.size();
}

Position SourceText::PositionOf(const char* at) const { return PositionFrom(0, at); }

Position SourceText::PositionFrom(int32_t line, const char* at) const {
  if (outer_) return outer_->PositionFrom(line, at);
  const auto offset = static_cast<uint32_t>(at - begin_);
  const auto count = static_cast<int32_t>(line_starts.size());
  if (line < 0 || line >= count || line_starts[line] > offset) return {0, static_cast<int32_t>(offset)};
  int32_t low = line;  // the line starts at or in front of the place
  int32_t step = 1;
  while (step < count - low && line_starts[low + step] <= offset) {
    low += step;
    step *= 2;
  }
  const auto first = line_starts.begin();
  const auto next = std::upper_bound(first + low + 1, first + std::min(low + step, count), offset);
  low = static_cast<int32_t>(next - first) - 1;
  return {low, static_cast<int32_t>(offset - line_starts[low])};
}

}  // namespace quillet
