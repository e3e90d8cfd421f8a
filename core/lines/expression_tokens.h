// Tokens of an expression that stands in the middle of a source: in a string or in a comment.
//
// Such an expression ends where its surroundings say and not at a token's end, so every token is cut
// off there. It is an expression and no statement: a token that could make a statement of it gets
// the code of an error token, and the parser rejects it in its place.
#pragma once

#include <cstdint>
#include <vector>

#include "tokens/token.h"

namespace quillet {

// The token at `at`, which is below `end` and stands on no blank and no line end. Strings are those
// of the newest version, whose formatted strings nest; strings of older ones end alike. Bytes up to
// 32 behind `end` are loaded and must be readable. Returns the token's end.
const char* ScanExpressionToken(const char* at, const char* end, Token& token);

// `at`, or the first byte behind it that is no blank and no line end.
const char* SkipBlanksAndLineEnds(const char* at, const char* end);

// Judges the tokens of one expression, in order.
class ExpressionCheck {
 public:
  // The open brackets in front of the next token.
  uint32_t depth() const { return depth_; }
  // Takes the next token; it is marked as an error where no expression goes on like this.
  void Add(Token& token);

 private:
  uint32_t depth_ = 0;
  uint32_t lambdas_ = 0;  // outside of brackets, whose colon is still to come
  bool is_first_ = true;
};

// Appends the tokens of the expression that fills the bytes from `at` to `end`, comments included.
void AppendExpressionTokens(const char* at, const char* end, std::vector<Token>& tokens);

}  // namespace quillet
