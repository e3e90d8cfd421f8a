// The rules of one file of ignore patterns (.gitignore and its like): which paths they exclude.
//
// Rules mean what they mean to git: the last one that matches decides, a leading `!` takes a path in again,
// a trailing `/` means folders alone, a rule with another `/` is anchored to the folder of the rules, `*` and
// `?` keep to one part of a path, and `**` between slashes stands for any number of parts. Everything counts in
// bytes. A rule that is no pattern (`[a`, a trailing backslash) matches nothing.
// The trap: patterns come from anywhere, so a match must not try the stars one against another. All
// the places that a pattern may have reached go through the path together, which takes time in proportion
// to the two lengths; most rules are settled before that by a text that the path must hold.
#pragma once

#include <array>
#include <bitset>
#include <cstdint>
#include <string>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class IgnoreRules {
 public:
  enum class Verdict : uint8_t { kNone, kExcluded, kIncluded };

  // `text` is the content of the file. A copy is kept of what is needed.
  explicit IgnoreRules(Text text);

  // What the rules say of a path, given from their folder with `/` between its parts. Of the folders
  // above the path nothing is said: what stands in one that is excluded is excluded. One thread at a time.
  Verdict Of(Text path, bool is_folder);

  bool empty() const { return rules_.empty(); }

 private:
  // What a step takes of a path; the last three may take nothing.
  enum class StepKind : uint8_t {
    kByte,       // that byte
    kPartByte,   // any but a slash
    kSet,        // one of a set
    kPartBytes,  // any number without a slash
    kBytes,      // any number
    kFolders,    // nothing, or any number with a slash at its end
  };
  struct Step {
    StepKind kind;
    uint8_t byte = 0;
    uint32_t set = 0;
  };
  using ByteSet = std::bitset<256>;

  struct Rule {
    bool includes = false;
    bool folders_only = false;
    bool last_part_only = false;  // the rule is for the path's last part
    std::string head;             // what the path begins with
    std::vector<Step> steps;      // behind it
    std::string tail;             // what the path ends with, at the end of `steps`, too
    std::string needle;           // the longest text of `steps`
    size_t least_size = 0;        // of what `steps` take
  };

  void Add(Text line);
  bool AddSteps(Text pattern, Rule& rule);
  size_t AddStars(Text pattern, size_t at, Rule& rule);
  bool AddSet(Text pattern, size_t& at, Rule& rule);
  static void Prepare(Rule& rule);
  bool Matches(const Rule& rule, Text path);
  bool TakesAll(const std::vector<Step>& steps, Text path);
  void Reach(const std::vector<Step>& steps, size_t step);

  std::vector<Rule> rules_;
  std::vector<ByteSet> sets_;
  // The steps that are reached before a byte and behind it, and for each step the byte before which it was
  // reached last.
  std::vector<uint32_t> reached_;
  std::vector<uint32_t> reached_next_;
  std::vector<uint32_t> reached_at_;
  uint32_t at_byte_ = 0;
};

}  // namespace quillet
