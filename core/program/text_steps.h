// What is around places of a source, told without its tokens: code, or a comment or a string. For who looks for words
// in sources of which most are not worth an analysis.
#pragma once

#include <cstddef>
#include <cstdint>

#include "foundations/text.h"

namespace quillet {

class TextSteps {
 public:
  enum class Around : uint8_t {
    kCode,
    kText,     // a comment, or a string that is not formatted
    kUnknown,  // a formatted string, whose fields are code, or one that does not end
  };

  explicit TextSteps(Text source) : source_(source) {}

  // Places are asked for in their order, each within the source. What stands behind the last one is not looked at.
  Around At(size_t place) {
    while (end_ <= place) {
      end_ = FindMark(place);
      if (end_ == place) return Around::kCode;
      StepOver();
    }
    return may_hold_code_ ? Around::kUnknown : Around::kText;
  }

 private:
  // Where a comment or a string begins in front of a place; the place where none does.
  size_t FindMark(size_t place) const;
  void StepOver();
  void StepOverString();

  const Text source_;
  size_t end_ = 0;              // all in front of it was stepped over
  bool may_hold_code_ = false;  // of what was stepped over last
};

}  // namespace quillet
