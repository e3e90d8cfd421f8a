// Classes of code points, as the host's Unicode tables have them.
//
// The tables are filled a page of 256 code points at a time, on first use, by a loader. The
// bindings install one that asks the interpreter. Without a host ASCII is classified as Python does it
// and every code point from 0x80 on counts as a letter, as it does for most tools that only look at
// ASCII. Pages are published atomically: threads may ask without a lock.
#pragma once

#include <cstdint>

namespace quillet {

enum CharClass : uint8_t {
  kCharAlpha = 1,        // str.isalpha
  kCharDecimal = 2,      // str.isdecimal
  kCharDigit = 4,        // str.isdigit
  kCharNumeric = 8,      // str.isnumeric
  kCharSpace = 16,       // str.isspace
  kCharIdStart = 32,     // str.isidentifier of the character alone
  kCharIdContinue = 64,  // str.isidentifier behind a letter
  kCharPrintable = 128,  // str.isprintable
};

inline constexpr uint8_t kCharAlnum = kCharAlpha | kCharDecimal | kCharDigit | kCharNumeric;

inline constexpr uint32_t kCodePointLimit = 0x110000;
inline constexpr uint32_t kCharPageSize = 256;

// Bits of CharClass for any code point below kCodePointLimit; 0 beyond.
uint8_t CharClassOf(uint32_t code_point);

// Fills kCharPageSize entries for the code points from `first` on. It may run in several threads at
// once for the same page.
using CharPageLoader = void (*)(uint32_t first, uint8_t* classes);

// Pages that an earlier loader filled are dropped; nullptr brings the default loader back. To be
// called before other threads classify text: one that loads a page meanwhile may publish what the
// earlier loader said.
void SetCharPageLoader(CharPageLoader loader);

}  // namespace quillet
