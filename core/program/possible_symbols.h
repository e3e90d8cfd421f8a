// What a source may define for others to look for by name, told by its lines: all classes, functions and variables of
// modules and classes that it defines, and some names more. Takes a quarter of the time that binding takes.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

class PossibleSymbols {
 public:
  struct Symbol {
    Text name;           // a view of the source
    bool is_variable;    // otherwise a class or a function
    bool may_be_member;  // otherwise surely in the body of no class
  };

  // False where lines do not tell: in Python 2, behind a string that does not end, and where characters beyond ASCII
  // stand in code. The bytes of `source` stay what they are; behind them there must be room to write.
  bool Read(std::string& source, Version version);
  // Of the last source, in its order; some more than once.
  const std::vector<Symbol>& symbols() const { return symbols_; }

 private:
  struct Block {
    uint32_t indent;
    bool is_function;
  };
  class Statement;

  bool ReadLines();
  // Of the line whose indentation ends at `at`, and what goes on behind it: to the next line. Null where it does not
  // tell.
  const char* ReadLine(const char* at, uint32_t indent);
  const char* SkipLine(const char* at) const;
  const char* StringEnd(const char* quote) const;
  const char* ReadNameBehind(const char* at);
  void ReadNamedExpressions();

  Version version_;
  const char* begin_ = nullptr;
  const char* end_ = nullptr;
  std::vector<Block> blocks_;  // around the line, the innermost last
  bool is_in_block_ = false;   // whether the line is indented, or in the body of a class
  std::vector<Symbol> symbols_;
};

}  // namespace quillet
