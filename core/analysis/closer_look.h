// Whether a statement that the tables take may be one that its version of Python does not.
//
// The tables know two grammars, and no context. Most statements hold nothing that could make a difference,
// which one pass over the codes of their tokens tells; those that do are read once more by the parser that
// knows every rule (complete_parser.h), and its answer counts.
#pragma once

#include <array>

#include "lines/logical_line.h"
#include "lines/scopes.h"

namespace quillet {

class CloserLook {
 public:
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

  explicit CloserLook(Version version);

  // Whether only the complete parser can read such a statement as the version has it.
  bool NeedsCompleteParser(const LogicalLine& line) const;
  // Where a statement that the tables took is to be read again.
  uint8_t DoubtOf(const LogicalLine& line) const;
  bool IsDoubtful(const LogicalLine& line, const LinePlace& place) const { return IsDoubtAt(DoubtOf(line), place); }
  static bool IsDoubtAt(uint8_t doubt, const LinePlace& place) {
    return doubt != kNowhere && (doubt & BitsOf(place)) != 0;
  }

 private:
  static uint8_t BitsOf(const LinePlace& place) {
    return static_cast<uint8_t>((place.depth == 0 ? kInModule : kInDefinition) |
                                (place.in_def ? 0 : kOutsideOfFunction) |
                                (place.in_async_def ? kInAsync : kOutsideOfAsync));
  }
  uint8_t DoubtOfToken(const LogicalLine& line, size_t i) const;

  const bool python3_;
  const int minor_;
  bool is_old_;  // of versions that lack so much that each statement is looked at
  // By the code of a token: of which lengths it is looked at, a bit each, counted in a circle.
  std::array<uint32_t, 256> unusual_{};
};

}  // namespace quillet
