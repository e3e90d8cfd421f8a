// The bytes of a file (or of a hint) with what one pass over them found: tokens and line starts.
//
// Everything that is cut out of a source, tokens, logical lines and the texts of nodes, is a view
// into it and lives as long as a reference to it is held. The bytes are followed by kPadding NUL
// bytes, so that scans may load whole words past the end.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "foundations/ref.h"
#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

class SourceText : public RefCounted {
 public:
  static constexpr size_t kPadding = 64;
  // Offsets are 32 bits wide; a longer source is cut off here (4 GiB less one page).
  static constexpr size_t kMaxSize = 0xFFFFF000u;

  // Copies the bytes, and pads them.
  static Ref<SourceText> Copy(Text bytes);
  // A source of its own tokens over the bytes of another one, which it keeps alive: for expressions
  // inside a string or a comment. Positions are those of the outer source.
  static Ref<SourceText> Within(Ref<SourceText> outer);

  const char* begin() const { return begin_; }
  const char* end() const { return begin_ + size_; }
  size_t size() const { return size_; }
  Text text() const { return {begin_, size_}; }
  bool Holds(const char* at) const { return at >= begin_ && at <= begin_ + size_; }

  // Fresh content in the same memory, for a reader that takes file after file. Tokens and line
  // starts are dropped.
  void Assign(Text bytes);

  // Offset of the first byte of each physical line; the first is 0 (or 3, behind a BOM). A source
  // that ends with a line end has one more, its size.
  std::vector<uint32_t> line_starts;
  std::vector<Token> tokens;

  // The line and column (from 0) of a place in the bytes. Logarithmic in the number of lines.
  Position PositionOf(const char* at) const;
  // The same for a place known to stand at or after `line`, as all tokens of a statement do:
  // logarithmic in the number of lines between.
  Position PositionFrom(int32_t line, const char* at) const;

 private:
  SourceText() = default;

  std::unique_ptr<char[]> buffer_;
  size_t capacity_ = 0;
  const char* begin_ = nullptr;
  size_t size_ = 0;
  Ref<SourceText> outer_;
};

}  // namespace quillet
