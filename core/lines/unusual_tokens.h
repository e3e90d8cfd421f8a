// Which tokens give reason to look at a statement more closely: those that only some versions take, or some places.
//
// A cutter asks this while it has each token in hand anyway, so that what looks closely (closer_look.h) knows of most
// statements that nothing is to be found in them. Names and operators cost a comparison, brackets and the like nothing.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>

#include "tokens/byte_scan.h"
#include "tokens/token.h"
#include "tokens/token_ends.h"

namespace quillet {

class UnusualTokens {
 public:
  enum Reason : uint8_t {
    kReturn = 1,  // that matters outside of functions
    kOther = 2,
    // No token, but where the statement stands: there is more on its line than its tokens, or more in front of it than
    // blanks, or it is `async`.
    kPlace = 4,
  };

  explicit UnusualTokens(Version version)
      : python3_(version.AtLeast(3, 0)),
        at_first_(python3_ && !version.AtLeast(3, 6) ? kOther : 0),
        operators_(Bit(tok::VBAREQUAL) | Bit(tok::RARROW) | Bit(python3_ ? tok::NOTEQUAL : tok::STAR) |
                   (python3_ && !version.AtLeast(3, 8) ? Bit(tok::SLASH) : 0)) {
    Reset();
  }

  // ---- the tokens of a statement ----

  void SeeName(TokenCode code) {
    static_assert(word::kNone < word::kAsync && word::kAsync < word::kAwait && word::kAwait < word::kNonlocal &&
                  word::kNonlocal < word::kReturn && word::kReturn < word::kYield && word::kYield + 1 == word::kEnd);
    if (code >= word::kNone) [[unlikely]]
      reasons_ |= code == word::kReturn              ? kReturn
                  : code == word::kAsync             ? kOther | kPlace
                  : code != word::kNone || !python3_ ? kOther
                                                     : 0;
  }
  // In front of the name itself.
  void SeeUnderscore(const char* name) {
    if (std::memcmp(name, kDebug.data(), kDebug.size()) == 0) [[unlikely]]
      reasons_ |= kOther;
  }
  void SeeOperator(char first, TokenCode code) {
    if ((operators_ >> code & 1) == 0) return;
    // "!=" has the code of "<>".
    if (code != tok::NOTEQUAL || first == '<') reasons_ |= kOther;
  }
  void SeeWalrus() { reasons_ |= kOther; }
  void SeeNumber(Text number) {
    if (!IsPlainNumber(number)) reasons_ |= kOther;
  }
  // In a string under way, which may turn out not to be one.
  void SeeEscape(const char* backslash) { saw_odd_escape_ |= kMayBeOdd[static_cast<unsigned char>(backslash[1])]; }
  bool saw_odd_escape() const { return saw_odd_escape_; }
  // One with a prefix, or an odd escape, and the code of the token in front.
  void SeeString(Text string, TokenCode before) {
    saw_odd_escape_ = false;
    if (!IsPlainString(string) && !ArePlainBytes(string, before)) reasons_ |= kOther;
  }
  void SeePlace() { reasons_ |= kPlace; }
  // How the statement ends counts where it imports.
  void SeeEndOfImport(const Token& last) {
    if (!IsNameCode(last.code) && last.code != tok::RPAR) reasons_ |= kOther;
  }

  uint8_t reasons() const { return reasons_; }
  void Reset() { reasons_ = at_first_; }

  static bool IsHexDigit(char c) { return IsAsciiDigit(c) || ((c | 0x20) >= 'a' && (c | 0x20) <= 'f'); }

  // Without a prefix, and without an escape that may be wrong: most are a letter for a line end or a quote.
  static bool IsPlainString(Text string) {
    const char* const at = string.data();
    if (!IsQuote(*at)) return (*at | 0x20) == 'r' && IsQuote(at[1]);
    return HasPlainEscapes(string);
  }
  static bool HasPlainEscapes(Text string) {
    const char* at = string.data();
    const char* const end = at + string.size();
    for (; (at = FindAny<'\\'>(at, end)) < end; at += 2) {
      if (at[1] == 'N' || at[1] == 'U') return false;
      const int digits = at[1] == 'x' ? 2 : at[1] == 'u' ? 4 : 0;
      for (int i = 0; i < digits; ++i)
        if (!IsHexDigit(at[2 + i])) return false;
    }
    return true;
  }

 private:
  static constexpr Text kDebug = "__debug__";
  // By the letter behind the backslash: where more has to follow it (see HasPlainEscapes).
  static constexpr auto kMayBeOdd = [] {
    std::array<bool, 256> table{};
    for (const char letter : {'N', 'U', 'u', 'x'}) table[static_cast<unsigned char>(letter)] = true;
    return table;
  }();

  static constexpr uint64_t Bit(TokenCode code) { return uint64_t{1} << code; }

  // ASCII, and neither in front of another string nor behind one.
  static bool ArePlainBytes(Text string, TokenCode before) {
    const char* const at = string.data();
    return (*at | 0x20) == 'b' && IsQuote(at[1]) && before != tok::STRING && !IsSkipCode(before) &&
           std::ranges::none_of(string, [](char c) { return static_cast<unsigned char>(c) >= 0x80; }) &&
           HasPlainEscapes(string) && !MayBeString(at + string.size());
  }
  // What follows behind blanks and line ends, as far as its first bytes tell.
  static bool MayBeString(const char* at) {
    while (*at == ' ' || IsLineEnd(*at)) ++at;
    return *at == '#' || *at == '\\' || *at == '\t' || *at == '\f' || IsQuote(*at) ||
           (IsAsciiLetter(*at) && (IsQuote(at[1]) || IsQuote(at[2])));
  }

  // One that means the same in every version.
  bool IsPlainNumber(Text number) const {
    const char next = *(number.data() + number.size());
    if (IsAsciiIdentifierByte(next) || static_cast<unsigned char>(next) >= 0x80) return false;
    if (number.size() == 1) return true;
    if ((number.back() | 0x20) == 'l' || (number[0] == '0' && (IsAsciiDigit(number[1]) || number[1] == '_')))
      return false;
    return python3_ || number.find('_') == Text::npos;
  }

  const bool python3_;
  const uint8_t at_first_;    // of versions that lack so much that each statement is looked at, a reason
  const uint64_t operators_;  // a bit a code
  uint8_t reasons_;
  bool saw_odd_escape_ = false;
};

}  // namespace quillet
