// Inference::Remembered: how a value is found once.
#pragma once

#include <algorithm>

#include "foundations/stop.h"
#include "inference/inference.h"

namespace quillet {

// File, node and frame as one number; 0 where they are too large to be remembered.
inline uint64_t KeyOf(uint64_t file, uint64_t node, uint64_t frame) {
  if (file >= 1u << 20 || node >= 1u << 24 || frame >= 1u << 20) return 0;
  return (file << 44 | node << 20 | frame) + 1;
}

// What finding a value takes beside the values that it is found from.
inline constexpr int64_t kStepsOfValue = 8;

template <class Find>
Value Inference::Remembered(NumberMap<Memo>& memos, uint64_t key, Find&& find) {
  if (key != 0) {
    const Memo* known = memos.Find(key);
    if (known != nullptr && known->depth != Memo::kNone) {
      if (known->depth == 0) return {known->set, known->doubt};
      shallowest_cycle_ = std::min(shallowest_cycle_, int{known->depth});
      return {};
    }
  }
  if (steps_ == 0 || depth_ >= kMaxDepth) {
    shallowest_cycle_ = 0;  // nothing on the way here may be remembered
    return kUnknownValue;
  }
  --steps_;
  CountSteps(kStepsOfValue);
  const int own_depth = ++depth_;
  const int cycle_outside = shallowest_cycle_;
  shallowest_cycle_ = INT32_MAX;
  if (key != 0) memos.Put(key, {kNoTypes, static_cast<int16_t>(own_depth), 0});
  const Value value = find();
  --depth_;
  const bool is_whole = shallowest_cycle_ >= own_depth;
  if (key != 0) {
    memos.Put(key, is_whole ? Memo{value.set, 0, value.doubt} : Memo());
  }
  shallowest_cycle_ = std::min(cycle_outside, is_whole ? INT32_MAX : shallowest_cycle_);
  return value;
}

}  // namespace quillet
