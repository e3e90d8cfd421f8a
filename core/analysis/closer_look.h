// Whether a statement that the tables take may be one that its version of Python does not.
//
// The tables know two grammars, and no context. Most statements hold nothing that could make a difference, which
// their cutter tells (unusual_tokens.h); those that do are looked at here, and where a doubt stays they are read once
// more by the parser that knows every rule (complete_parser.h), and its answer counts.
#pragma once

#include <array>

#include "lines/logical_line.h"
#include "lines/scopes.h"
#include "lines/unusual_tokens.h"

namespace quillet {

class CloserLook {
 public:
  explicit CloserLook(Version version);

  // Whether only the complete parser can read such a statement as the version has it.
  bool NeedsCompleteParser(const LogicalLine& line) const {
    return (line.toks.empty() || kTellingBeginnings[line.toks[0].code]) && NeedsCompleteParserBehind(line);
  }
  // Whether a statement that the tables took is to be read again.
  bool IsDoubtful(const LogicalLine& line, const LinePlace& place) const {
    return (DoubtOf(line) & BitsOf(place)) != 0;
  }
  // False where it is not, by what the cutter says of it.
  static bool MayBeDoubtful(uint8_t unusual, const LinePlace& place) {
    return (unusual & kReasonsAt[place.in_def][place.in_async_def]) != 0;
  }

 private:
  // The places in which a statement is doubtful, a bit each. Every place has one of the first two.
  enum Doubt : uint8_t {
    kInModule = 1,
    kInDefinition = 2,  // of a function or a class, around it
    kOutsideOfFunction = 4,
    kInAsync = 8,
    kOutsideOfAsync = 16,
    kNowhere = 0,
    kEverywhere = kInModule | kInDefinition,
  };

  static uint8_t BitsOf(const LinePlace& place) {
    return static_cast<uint8_t>((place.depth == 0 ? kInModule : kInDefinition) |
                                (place.in_def ? 0 : kOutsideOfFunction) |
                                (place.in_async_def ? kInAsync : kOutsideOfAsync));
  }
  // The reasons that matter there, by whether that is a function, and whether it is one that waits.
  static constexpr uint8_t kReasonsAt[2][2] = {
      {UnusualTokens::kOther | UnusualTokens::kReturn | UnusualTokens::kYield | UnusualTokens::kAwait,
       UnusualTokens::kOther | UnusualTokens::kReturn | UnusualTokens::kYield},
      {UnusualTokens::kOther | UnusualTokens::kAwait, UnusualTokens::kOther | UnusualTokens::kYield},
  };
  // What begins with none of these needs no complete parser, whatever kind it is of.
  static constexpr auto kTellingBeginnings = [] {
    std::array<bool, 256> table{};
    for (const TokenCode code : {TokenCode{word::kAsync}, TokenCode{word::kCase}, TokenCode{word::kClass},
                                 TokenCode{word::kDef}, TokenCode{word::kExcept}, TokenCode{word::kMatch},
                                 TokenCode{word::kType}, TokenCode{word::kWith}, tok::COMMENT, tok::BACKSLASH})
      table[code] = true;
    return table;
  }();
  bool NeedsCompleteParserBehind(const LogicalLine& line) const;
  uint8_t DoubtOf(const LogicalLine& line) const;
  // Whether a token may stand in a lambda or an annotation, by those in front of it.
  bool MayBeInScope(TokenSpan toks, size_t i) const;
  uint8_t DoubtOfToken(const LogicalLine& line, size_t i) const;

  const bool python3_;
  const int minor_;
  const bool is_old_;                   // of versions that lack so much that each statement is looked at
  std::array<bool, 256> is_unusual_{};  // by the code of a token
};

}  // namespace quillet
