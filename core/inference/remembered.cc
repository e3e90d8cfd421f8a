#include "inference/remembered.h"

#include <set>
#include <utility>

namespace quillet {

Value Inference::Guess(Value sure, Value guessed) {
  if (sure.doubt != 0) return {guessed.set, static_cast<uint8_t>(guessed.doubt | Value::kOpen)};
  // What is sure has types whose arguments are open: these are what was guessed.
  const TypeList known = types_.CopyOf(sure.set);
  for (const TypeId type : types_.CopyOf(guessed.set)) {
    const bool is_known = std::ranges::any_of(known, [&](TypeId other) {
      const TypeKind kind = types_[type].kind;
      if (kind == TypeKind::kTuple || kind == TypeKind::kInstance) return ClassOfType(type) == ClassOfType(other);
      return types_[other].kind == kind && types_[other].a == types_[type].a;
    });
    if (!is_known) return sure;
  }
  return guessed.IsKnown() ? Value{guessed.set, 0} : sure;
}

void Inference::ForgetForNow(size_t first) {
  for (size_t i = first; i < for_now_.size(); ++i)
    for_now_[i].memos->levels[static_cast<size_t>(for_now_[i].level)].found.Put(for_now_[i].key, {});
  for_now_.resize(first);
}

void Inference::Settle(size_t first, bool needs_level, bool is_open) {
  for (size_t i = first; i < for_now_.size(); ++i) {
    const Found& each = for_now_[i];
    MemosOfLevel& level = each.memos->levels[static_cast<size_t>(each.level)];
    const Memo* there = level.found.Find(each.key);
    if (there == nullptr || there->state == Memo::kNone) continue;
    Value value = there->value;
    if (is_open || (value.doubt & Value::kNotYet) != 0) value = kUnknownValue;
    if (!needs_level && each.memos->known.Find(each.key) == nullptr) each.memos->known.Put(each.key, value);
    level.found.Put(each.key, needs_level ? Memo{value, 0, Memo::kKnown, true} : Memo());
    if (!level.assumed.empty()) level.assumed.erase(each.key);
  }
  for_now_.resize(first);
}

void Inference::FindCut(const Found& what) {
  const uint64_t parts = what.key - 1;
  const auto file = static_cast<FileId>(parts >> 44);
  const auto node = static_cast<uint32_t>(parts >> 20 & 0xFFFFFF);
  const auto frame = static_cast<FrameId>(parts & 0xFFFFF);
  if (what.memos == &values_) ValueOf(file, node, frame);
  if (what.memos == &bindings_) ValueOfBinding({file, node}, frame);
  if (what.memos == &results_) ResultIn(node, frame);
  if (what.memos == &hints_) ValueOfHint(file, node);
}

// What is cut on the way to something that was cut is found before it.
bool Inference::FindCuts() {
  static constexpr int kMaxRounds = 8;
  const size_t first = for_now_.size();
  std::vector<Found> wanted;
  wanted.swap(cuts_);
  if (++cut_rounds_ > kMaxRounds) return false;
  is_finding_cuts_ = true;
  bool has_found = false;
  std::set<std::pair<Memos*, uint64_t>> seen;
  for (const Found& each : wanted) seen.emplace(each.memos, each.key);
  while (!wanted.empty() && steps_ > 0) {
    cuts_.clear();
    FindCut(wanted.back());
    const bool was_cut = lowest_ == surface_;
    lowest_ = INT32_MAX;
    ForgetForNow(first);
    const size_t count = wanted.size();
    if (was_cut)
      for (const Found& each : cuts_)
        if (seen.emplace(each.memos, each.key).second) wanted.push_back(each);
    if (wanted.size() > count) continue;
    has_found = has_found || !was_cut;
    wanted.pop_back();
  }
  cuts_.clear();
  is_finding_cuts_ = false;
  return has_found && steps_ > 0;
}

}  // namespace quillet
