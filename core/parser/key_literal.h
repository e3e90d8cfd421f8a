// The value of a literal that is a key of a mapping pattern, as far as it tells whether two of them are the same.
//
// Numbers are the same whatever their type and spelling; strings side by side are one. What an escape by name stands
// for is not known: it is taken for its own text.
#pragma once

#include <string>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

class KeyLiteral {
 public:
  explicit KeyLiteral(TokenSpan toks);

  // Equal for keys that are.
  const std::string& value() const { return value_; }
  // As the language shows it; a number as it is spelt.
  std::string Shown() const;

 private:
  void ReadNumber();
  void ReadStrings();

  TokenSpan toks_;
  std::string value_;
};

}  // namespace quillet
