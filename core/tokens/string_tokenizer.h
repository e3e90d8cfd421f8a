// The tokens of a text one by one, with their offsets and the brackets open in front of them.
//
// The text is scanned once, at construction, by the tokeniser that files go through; blanks and line
// ends are no tokens. It never fails: what is no token is one with the code of an error.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

class CStringTokenizer {
 public:
  // Copies the bytes and stands at their first token.
  explicit CStringTokenizer(Text utf8_bytes);
  CStringTokenizer(const CStringTokenizer&) = delete;
  CStringTokenizer& operator=(const CStringTokenizer&) = delete;

  // Whether no token remains.
  bool AtEnd() const { return index_ == tokens_.size(); }
  // The current token; none at the end. Valid as long as the tokenizer.
  Text Current() const { return AtEnd() ? kNoText : tokens_[index_].view(); }
  // Its code; tok::ENDMARKER at the end.
  TokenCode CurrentCode() const { return AtEnd() ? tok::ENDMARKER : tokens_[index_].code; }
  // Its offset in the text, in bytes; the text's length at the end.
  int64_t Offset() const { return (AtEnd() ? end_ : tokens_[index_].text) - bytes_.data(); }
  // How many brackets, of all three kinds, are open in front of it. Closing brackets without an open
  // one count for nothing.
  int64_t BracketDepth() const { return bracket_depth_; }

  // Moves to the next token; at the end nothing happens.
  void Advance();

 private:
  std::string bytes_;  // padded for the scanner
  const char* end_;
  std::vector<Token> tokens_;
  size_t index_ = 0;
  int64_t bracket_depth_ = 0;
};

}  // namespace quillet
