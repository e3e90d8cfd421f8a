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
  explicit CloserLook(Version version);

  // Whether the source that statements are of holds a name that none may bind.
  void set_holds_debug_name(bool holds) { holds_debug_name_ = holds; }

  // Whether only the complete parser can read such a statement as the version has it.
  bool NeedsCompleteParser(const LogicalLine& line) const;
  // Whether a statement that the tables took is to be read again.
  bool IsDoubtful(const LogicalLine& line, const LinePlace& place) const;

 private:
  bool IsDoubtfulToken(const LogicalLine& line, size_t i, const LinePlace& place) const;

  const bool python3_;
  const int minor_;
  bool is_old_;  // of versions that lack so much that each statement is looked at
  bool holds_debug_name_ = false;
  std::array<bool, 256> unusual_{};
};

}  // namespace quillet
