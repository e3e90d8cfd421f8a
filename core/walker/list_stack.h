// Lists that keep their memory, lent out one inside the other: a call's arguments are read into one
// while the calls among them read theirs into the next.
#pragma once

#include <cstddef>
#include <deque>

namespace quillet {

template <class List>
class ListStack {
 public:
  // Lends a list as long as it lives. Its content is that of the last use.
  class Lease {
   public:
    explicit Lease(ListStack& stack) : stack_(stack) {
      if (stack.used_ == stack.lists_.size()) stack.lists_.emplace_back();
      list_ = &stack.lists_[stack.used_++];
    }
    ~Lease() { --stack_.used_; }
    Lease(const Lease&) = delete;
    Lease& operator=(const Lease&) = delete;

    List& operator*() const { return *list_; }

   private:
    ListStack& stack_;
    List* list_;
  };

 private:
  std::deque<List> lists_;  // a list stays where it is while others are added
  size_t used_ = 0;
};

}  // namespace quillet
