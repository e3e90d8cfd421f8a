// StatementShapes: what a statement says, told from one of the same shape, without parsing it.
//
// Most statements are like an earlier one: the same tokens but for names, numbers and strings, and the same of
// these equal to each other. What the parser and the walkers do with such a statement differs in nothing but the
// texts in its records, and these are pieces of the statement's own tokens. So the records of a shape are kept as
// a plan, which says from which tokens each text is taken, and the next statement of the shape gets its records
// from the plan.
//
// A plan is not written by hand but read off: when a shape is met again and again, a statement of it is made up in
// which each name, number and string is a text that stands for itself, and is analysed as any other. What the
// records hold of these texts is the plan. This is right as long as nothing between parser and records looks at a
// text for more than what the shape already holds of it, which is
//   - which names, numbers and strings are equal
//   - whether two tokens touch, are one blank apart, or stand otherwise
//   - of a string its prefix, and whether its contents are shown
//   - the very text of the few names that mean something to a walker, of numbers that are not digits alone, and
//     of an operator that shares its code with another one
// and as long as no text meets the limit of length of operator expressions, where the analysis itself decides.
// Whoever makes a walker look at more has to say so in Key. The tests and the fuzz target of statement shapes
// compare both ways.
//
// Statements that hold expressions of their own in a token, that are long, that fail or may be doubted are none
// of its business. The table of shapes has a fixed size; each analyzer has one of its own.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "analysis/analyzer.h"

namespace quillet {

class StatementShapes {
 public:
  // How often a shape is met until it has a plan, unless somebody says otherwise.
  static constexpr uint8_t kFrequent = 4;

  // `frequent` 0: no shape ever has a plan.
  explicit StatementShapes(CPGenAnalyzerImpl& analyzer, uint8_t frequent = kFrequent);
  ~StatementShapes();
  StatementShapes(const StatementShapes&) = delete;
  StatementShapes& operator=(const StatementShapes&) = delete;

  // Appends to the line's records what its analysis would, and is true; or does nothing and is false, where the
  // analysis itself is asked for. The line is one that was cut from its source, without hooks.
  bool Tell(LogicalLine& line, const LinePlace& place, const TypingNames& typing);

  // The analyzer's own AnalyzeSingleLogical, for any line of a host's, and told where that can be. Nobody may look
  // into the analyzer meanwhile, where nodes that were never made would be missed.
  std::optional<SyntaxError> AnalyzeSingleLogical(LogicalLine& line, bool in_async_def, bool first_in_def);

 private:
  class Key;
  class MadeUp;
  class Plan;
  class PlanReader;
  struct Set;

  static constexpr size_t kSets = size_t{1} << 12;
  static constexpr size_t kCounters = size_t{1} << 15;

  // Whether a shape without a plan is met often enough for one.
  bool IsFrequent(uint64_t hash);
  Plan Learn(const Key& key, const LogicalLine& line, bool in_async_def);

  CPGenAnalyzerImpl& analyzer_;
  const uint8_t frequent_;
  const bool is_able_;             // no word of the analyzer's own is a keyword
  std::vector<Set> sets_;          // by hash
  std::vector<uint8_t> counters_;  // by hash: how often shapes without a plan were met
  size_t misses_ = 0;              // since the counters were halved
  bool is_learning_ = false;       // a host may come back in the middle
  RecordStore made_up_records_;
  std::string scratch_;
};

}  // namespace quillet
