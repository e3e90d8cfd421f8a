// The names of one list, such as that of the parameters: which of them stood there before.
#pragma once

#include <algorithm>
#include <memory>
#include <unordered_set>
#include <vector>

#include "foundations/text.h"

namespace quillet {

class DistinctNames {
 public:
  // False for one that is there already.
  bool Add(Text name) {
    const bool is_new = table_ != nullptr ? table_->insert(name).second : std::ranges::find(all_, name) == all_.end();
    if (!is_new) return false;
    all_.push_back(name);
    if (table_ == nullptr && all_.size() > kFew) table_ = std::make_unique<Table>(all_.begin(), all_.end());
    return true;
  }

  size_t size() const { return all_.size(); }
  // Those from a place on, sorted.
  std::vector<Text> SortedFrom(size_t first) const {
    std::vector<Text> names(all_.begin() + static_cast<ptrdiff_t>(first), all_.end());
    std::ranges::sort(names);
    return names;
  }
  // Leaves only so many.
  void Truncate(size_t size) {
    for (size_t i = size; table_ != nullptr && i < all_.size(); ++i) table_->erase(all_[i]);
    all_.resize(size);
  }

 private:
  using Table = std::unordered_set<Text>;
  static constexpr size_t kFew = 16;

  std::vector<Text> all_;
  std::unique_ptr<Table> table_;  // of them, where there are more than few
};

}  // namespace quillet
