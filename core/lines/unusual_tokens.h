// Which tokens give reason to look at a statement more closely: those that only some versions take, or some places.
//
// A cutter asks this while it has each token in hand anyway, so that what looks closely (closer_look.h) knows of most
// statements that nothing is to be found in them, and what looks at their places (block_rules.h) that many are one more
// of the same. Names and operators cost a comparison, brackets and the like nothing.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>

#include "tokens/byte_scan.h"
#include "tokens/token.h"
#include "tokens/token_ends.h"

namespace quillet {

class ScanOutput;

class UnusualTokens {
 public:
  enum Reason : uint8_t {
    kReturn = 1,  // that matters outside of functions
    kOther = 2,
    // No token, but where the statement stands: there is more on its line than its tokens, or more in front of it than
    // blanks.
    kPlace = 4,
    kAwait = 16,  // that matters outside of `async def`
    kYield = 32,  // that matters outside of functions, and in an `async def`
    kReasons = kReturn | kOther | kPlace | kAwait | kYield,
  };
  // Beside the reasons: the row leaves the blocks of its source as they are, as blank lines and comments do, and a
  // plain statement behind another one of its block.
  static constexpr uint8_t kGoesOn = 8;
  // Words that are looked for among the tokens of a statement that may hold them.
  enum Word : uint8_t { kCast = 64, kLambda = 128, kAllWords = kCast | kLambda };

  explicit UnusualTokens(Version version)
      : python3_(version.AtLeast(3, 0)),
        at_first_(python3_ && !version.AtLeast(3, 6) ? kOther : 0),
        operators_(Bit(tok::VBAREQUAL) | Bit(tok::RARROW) | Bit(python3_ ? tok::NOTEQUAL : tok::STAR) |
                   (python3_ && !version.AtLeast(3, 8) ? Bit(tok::SLASH) : 0)) {
    // A comprehension in another could not wait before 3.11, and an annotation cannot from 3.14 on.
    const bool waits_anywhere = version.AtLeast(3, 11) && !version.AtLeast(3, 14);
    names_.fill(kOther);
    if (python3_) NameOf(word::kNone) = 0;
    NameOf(word::kCast) = kCast;
    NameOf(word::kLambda) = kLambda;
    if (waits_anywhere) NameOf(word::kAsync) = NameOf(word::kAwait) = kAwait;
    NameOf(word::kReturn) = kReturn;
    NameOf(word::kYield) = kYield;
    Reset();
  }

  // ---- the tokens of a statement ----

  // Behind the name itself.
  void SeeName(TokenCode code, const ScanOutput& out) {
    if (code >= word::kNone) [[unlikely]]
      SeeUnusualName(code, out);
  }
  // In front of the name itself.
  void SeeUnderscore(const char* name) {
    if (std::memcmp(name, kDebug.data(), kDebug.size()) == 0) [[unlikely]]
      seen_ |= kOther;
  }
  void SeeOperator(char first, TokenCode code) {
    if ((operators_ >> code & 1) == 0) return;
    // "!=" has the code of "<>".
    if (code != tok::NOTEQUAL || first == '<') seen_ |= kOther;
  }
  void SeeWalrus() { seen_ |= kOther; }
  void SeeNumber(Text number) {
    if (!IsPlainNumber(number)) seen_ |= kOther;
  }
  // In a string under way, which may turn out not to be one.
  void SeeEscape(const char* backslash) { saw_odd_escape_ |= kMayBeOdd[static_cast<unsigned char>(backslash[1])]; }
  bool saw_odd_escape() const { return saw_odd_escape_; }
  // One with a prefix, or an odd escape, and the code of the token in front.
  void SeeString(Text string, TokenCode before) {
    saw_odd_escape_ = false;
    if (!IsPlainRaw(string) && !(HasPlainPrefix(string, before) && HasPlainEscapes(string))) seen_ |= kOther;
  }
  void SeePlace() { seen_ |= kPlace; }
  // How the statement ends counts where it imports.
  void SeeEndOfImport(const Token& last) {
    if (!IsNameCode(last.code) && last.code != tok::RPAR) seen_ |= kOther;
  }

  // Those of Word, and more.
  uint8_t words() const { return seen_; }

  // At the end of a statement, with the code that tells its kind: the reasons, and whether it goes on.
  uint8_t SeeStatement(TokenCode lead, uint32_t indent) {
    const uint8_t plain = kPlainLeads[lead] & ~seen_;
    const uint64_t block = uint64_t{indent} << 8 | plain;
    const uint8_t goes_on = block == block_before_ ? plain * (kGoesOn / kPlace) : 0;
    block_before_ = block;
    return static_cast<uint8_t>((seen_ & kReasons) | goes_on);
  }

  void Reset() { seen_ = at_first_; }

  static bool IsHexDigit(char c) { return IsAsciiDigit(c) || ((c | 0x20) >= 'a' && (c | 0x20) <= 'f'); }

  // Without a prefix, and without an escape that may be wrong: most are a letter for a line end or a quote.
  static bool IsPlainString(Text string) { return IsQuote(string[0]) ? HasPlainEscapes(string) : IsPlainRaw(string); }
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

  // Plain is what holds no other statements and means the same wherever it stands; `match`, `case` and imports may be
  // more, and a row of comments is less. kPlace where a statement is plain unless it has this reason.
  static constexpr auto kPlainLeads = [] {
    std::array<uint8_t, 256> table{};
    table.fill(kPlace);
    for (const TokenCode code : {TokenCode{word::kAsync},
                                 TokenCode{word::kBreak},
                                 TokenCode{word::kCase},
                                 TokenCode{word::kClass},
                                 TokenCode{word::kContinue},
                                 TokenCode{word::kDef},
                                 TokenCode{word::kElif},
                                 TokenCode{word::kElse},
                                 TokenCode{word::kExcept},
                                 TokenCode{word::kFinally},
                                 TokenCode{word::kFor},
                                 TokenCode{word::kFrom},
                                 TokenCode{word::kGlobal},
                                 TokenCode{word::kIf},
                                 TokenCode{word::kImport},
                                 TokenCode{word::kMatch},
                                 TokenCode{word::kNonlocal},
                                 TokenCode{word::kTry},
                                 TokenCode{word::kWhile},
                                 TokenCode{word::kWith},
                                 tok::AT,
                                 tok::ENDMARKER})
      table[code] = 0;
    return table;
  }();

  static constexpr uint64_t Bit(TokenCode code) { return uint64_t{1} << code; }

  static_assert(word::kNone < word::kCast && word::kNone < word::kLambda && word::kNone < word::kAsync &&
                word::kNone < word::kAwait && word::kNone < word::kReturn && word::kNone < word::kYield);
  uint8_t& NameOf(TokenCode code) { return names_[code - word::kNone]; }
  void SeeUnusualName(TokenCode code, const ScanOutput& out);

  static bool IsPlainRaw(Text string) { return (string[0] | 0x20) == 'r' && IsQuote(string[1]); }
  bool HasPlainPrefix(Text string, TokenCode before) const {
    if (IsQuote(string[0])) return true;
    if (!IsQuote(string[1])) return false;
    return (string[0] | 0x20) == 'f' ? python3_ : (string[0] | 0x20) == 'b' && ArePlainBytes(string, before);
  }
  // ASCII, and neither in front of another string nor behind one.
  static bool ArePlainBytes(Text string, TokenCode before) {
    return before != tok::STRING && !IsSkipCode(before) &&
           std::ranges::none_of(string, [](char c) { return static_cast<unsigned char>(c) >= 0x80; }) &&
           !MayBeString(string.data() + string.size());
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
  std::array<uint8_t, word::kEnd - word::kNone> names_;  // reasons or words, by code from that of None on
  uint8_t seen_;                                         // reasons and words
  uint64_t block_before_ = 0;  // of the statement before: its indentation, and below that whether it is plain
  bool saw_odd_escape_ = false;
};

}  // namespace quillet
