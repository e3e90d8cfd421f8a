// Classes of code points beyond ASCII, as the host's Unicode tables have them.
//
// The tables are filled a page of 256 code points at a time, on first use, by a loader. The
// bindings install one that asks the interpreter (char_tables_host.cc, the only file of the core
// that sees Python's headers, and part of the extension alone). Without a host every code point
// from 0x80 on counts as a letter, as it does for most tools that only look at ASCII.
// Pages are published atomically: threads may ask without a lock.
#pragma once

#include <cstdint>

namespace quillet {

enum CharClass : uint8_t {
  kCharAlpha = 1,         // str.isalpha
  kCharDecimal = 2,       // str.isdecimal
  kCharDigit = 4,         // str.isdigit
  kCharNumeric = 8,       // str.isnumeric
  kCharSpace = 16,        // str.isspace
  kCharIdStart = 32,      // str.isidentifier of the character alone
  kCharIdContinue = 64,   // str.isidentifier behind a letter
};

inline constexpr uint8_t kCharAlnum = kCharAlpha | kCharDecimal | kCharDigit | kCharNumeric;

// Bits of CharClass for any code point below 0x110000; 0 beyond.
uint8_t CharClassOf(uint32_t code_point);

// Fills 256 entries for the code points from `first` on.
using CharPageLoader = void (*)(uint32_t first, uint8_t* classes);
void SetCharPageLoader(CharPageLoader loader);

}  // namespace quillet
