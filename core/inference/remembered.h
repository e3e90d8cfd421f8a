// Inference::Remembered: how a value is found once, whatever is asked first.
//
// It is found surely first, without guesses: what leaves a doubt there is not known at all, which is all that has to
// be found. Guesses are made only where that is so.
//
// What is met again while it is being found is taken for what it was assumed to be: for nothing at first. The
// outermost of such a ring finds it anew with what came out for each, until what comes out is what was assumed;
// then it holds for the whole ring. Until then the values of a ring are good for this round only. Guesses are made
// in one round.
//
// Where finding goes too deep it is cut, and what was found by way of a cut is good until the question's end. Of
// what is found surely, what was cut is found by itself then, from the surface, and the question is asked again.
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

class Inference::InFrame {
 public:
  InFrame(Inference& inference, FrameId frame) : in_(inference), before_(in_.frame_) { in_.frame_ = frame; }
  ~InFrame() { in_.frame_ = before_; }
  InFrame(const InFrame&) = delete;
  InFrame& operator=(const InFrame&) = delete;

 private:
  Inference& in_;
  const FrameId before_;
};

class Inference::Afresh {
 public:
  Afresh(Inference& inference, int depth, bool is_for_guess = false)
      : in_(inference),
        first_(in_.for_now_.size()),
        is_for_guess_(is_for_guess),
        was_within_guess_(in_.is_within_guess_),
        steps_(in_.steps_),
        max_depth_(in_.max_depth_),
        guess_level_(in_.guess_level_),
        lowest_(in_.lowest_),
        surface_(in_.surface_),
        needs_level_(in_.needs_level_),
        is_unsettled_(in_.is_unsettled_),
        has_met_nothing_(in_.has_met_nothing_) {
    static constexpr uint32_t kSteps = 2000;
    in_.surface_ = static_cast<int>(in_.finding_.size());
    in_.lowest_ = INT32_MAX;
    in_.is_within_guess_ = was_within_guess_ || (guess_level_ < kMaxGuesses && in_.depth_ > 0);
    in_.guess_level_ = kMaxGuesses;
    in_.max_depth_ = std::min(std::max(max_depth_, in_.depth_ + depth), 2 * kMaxDepth);
    in_.steps_ = is_for_guess ? in_.guess_steps_ : std::max(steps_, kSteps);
    given_ = in_.steps_;
  }
  ~Afresh() {
    in_.ForgetForNow(first_);
    const uint32_t used = given_ - in_.steps_;
    if (is_for_guess_) {
      in_.guess_steps_ -= std::min(in_.guess_steps_, used);
      in_.steps_ = steps_;
    } else {
      in_.steps_ = steps_ > used ? steps_ - used : 0;
    }
    in_.max_depth_ = max_depth_;
    in_.is_within_guess_ = was_within_guess_;
    in_.guess_level_ = guess_level_;
    in_.lowest_ = lowest_;
    in_.surface_ = surface_;
    in_.needs_level_ = needs_level_;
    in_.is_unsettled_ = is_unsettled_;
    in_.has_met_nothing_ = has_met_nothing_;
  }
  Afresh(const Afresh&) = delete;
  Afresh& operator=(const Afresh&) = delete;

 private:
  Inference& in_;
  const size_t first_;
  const bool is_for_guess_;  // what is found surely for its sake counts as steps of the guess
  const bool was_within_guess_;
  const uint32_t steps_;
  uint32_t given_ = 0;
  const int max_depth_, guess_level_, lowest_, surface_;
  const bool needs_level_, is_unsettled_, has_met_nothing_;
};

template <class Find>
Value Inference::Remembered(Memos& memos, uint64_t key, const Find& find) {
  static constexpr int kMaxRounds = 6;
  if (key != 0) {
    if (const Value* known = memos.known.Find(key)) return *known;
  }
  const bool is_sure = guess_level_ == kMaxGuesses;
  Value sure = kUnknownValue;
  if (!is_sure && &memos != &guesses_) {
    const Memo* known = key == 0 ? nullptr : memos.levels[kMaxGuesses].found.Find(key);
    if (known != nullptr && known->state == Memo::kKnown) {
      sure = known->value;
    } else {
      const Afresh afresh(*this, kMaxDepth, depth_ > 0);
      sure = Remembered(memos, key, find);
      if (key != 0 && memos.known.Find(key) != nullptr) return sure;
    }
    if (sure.doubt == 0 && !types_.HasOpen(sure.set)) return sure;
  }
  MemosOfLevel& own = memos.levels[static_cast<size_t>(guess_level_)];
  Memo before;
  if (key != 0) {
    if (const Memo* there = own.found.Find(key)) {
      const Memo memo = *there;
      if (memo.state == Memo::kKnown) {
        needs_level_ = true;
        return memo.value;
      }
      if (memo.state == Memo::kBeingFound && memo.at > surface_) {
        Finding& met = finding_[static_cast<size_t>(memo.at) - 1];
        met.is_met = true;
        lowest_ = std::min(lowest_, memo.at);
        has_met_nothing_ = has_met_nothing_ || (met.assumed.doubt & Value::kNotYet) != 0;
        return met.assumed;
      }
      if (memo.state == Memo::kForNow && memo.at >= surface_) {
        lowest_ = std::min(lowest_, memo.at);
        needs_level_ = needs_level_ || memo.needs_level;
        has_met_nothing_ = has_met_nothing_ || (memo.value.doubt & Value::kNotYet) != 0;
        return memo.value;
      }
      before = memo;
    }
  }
  uint32_t& steps = is_sure ? steps_ : guess_steps_;
  if (!is_sure) CountReading();
  if (steps == 0 || depth_ >= max_depth_) {
    lowest_ = std::min(lowest_, surface_);
    if (key != 0 && before.state == Memo::kNone && steps != 0 && is_sure) {
      cuts_.push_back({&memos, key, guess_level_});
      own.found.Put(key, {kUnknownValue, surface_, Memo::kForNow, false});
      for_now_.push_back(cuts_.back());
    }
    return kUnknownValue;
  }
  --steps;
  CountSteps(kStepsOfValue);
  ++depth_;
  const int lowest_outside = lowest_;
  const bool needs_level_outside = needs_level_, is_unsettled_outside = is_unsettled_;
  const bool has_met_nothing_outside = has_met_nothing_;
  const size_t first_for_now = for_now_.size();
  const int number = static_cast<int>(finding_.size()) + 1;
  Value assumed{kNoTypes, static_cast<uint8_t>(is_sure ? Value::kNotYet : 0)};
  if (!own.assumed.empty()) {
    if (const auto at = own.assumed.find(key); at != own.assumed.end()) assumed = at->second;
  }
  finding_.push_back({assumed, false});
  Value value;
  bool is_whole = false;
  for (int round = 1;; ++round) {
    if (key != 0) own.found.Put(key, {{}, number, Memo::kBeingFound, false});
    lowest_ = INT32_MAX;
    needs_level_ = is_unsettled_ = has_met_nothing_ = false;
    finding_.back().is_met = false;
    value = find();
    if (is_sure && value.doubt != 0 && has_met_nothing_) {
      value.doubt = Value::kNotYet;
    } else if (is_sure && value.doubt != 0) {
      if (!IsForeign(value)) value = kUnknownValue;
      needs_level_ = true;
    }
    if (!is_sure && &memos != &guesses_) value = Guess(sure, value);
    Finding& self = finding_.back();
    if (is_sure && self.is_met && value != self.assumed) {
      is_unsettled_ = true;
      self.assumed = {value.set, static_cast<uint8_t>(value.IsKnown() ? 0 : value.doubt)};
      own.assumed[key] = self.assumed;
    }
    is_whole = lowest_ >= number;
    if (!is_whole) break;
    if (!is_unsettled_ || round == kMaxRounds || steps == 0) {
      if (is_unsettled_ || (value.doubt & Value::kNotYet) != 0) {
        value = kUnknownValue;
        needs_level_ = true;
      }
      Settle(first_for_now, needs_level_, is_unsettled_);
      if (!own.assumed.empty()) own.assumed.erase(key);
      break;
    }
    ForgetForNow(first_for_now);
  }
  finding_.pop_back();
  --depth_;
  if (key != 0) {
    if (is_whole && !needs_level_) {
      if (memos.known.Find(key) == nullptr) memos.known.Put(key, value);
      own.found.Put(key, before);
    } else if (is_whole) {
      own.found.Put(key, {value, 0, Memo::kKnown, true});
    } else if (before.state != Memo::kNone) {
      own.found.Put(key, before);
    } else {
      own.found.Put(key, {value, lowest_, Memo::kForNow, needs_level_});
      for_now_.push_back({&memos, key, guess_level_});
    }
  }
  lowest_ = is_whole ? lowest_outside : std::min(lowest_outside, lowest_);
  needs_level_ = needs_level_ || needs_level_outside;
  has_met_nothing_ = has_met_nothing_outside || (value.doubt & Value::kNotYet) != 0;
  is_unsettled_ = is_whole ? is_unsettled_outside : is_unsettled_ || is_unsettled_outside;
  if (static_cast<int>(finding_.size()) == surface_ && !is_finding_cuts_) {
    const bool was_cut = lowest_ == surface_;
    lowest_ = INT32_MAX;
    ForgetForNow(first_for_now);
    if (was_cut && is_sure && FindCuts()) return Remembered(memos, key, find);
    if ((value.doubt & Value::kNotYet) != 0) value = kUnknownValue;
  }
  return value;
}

}  // namespace quillet
