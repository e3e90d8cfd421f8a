// How deep a complete reading may descend: brackets as the language counts them, all else by kMaxDepth.
#pragma once

#include "parser/complete_parser.h"

namespace quillet {

// One more level of rules for as long as it lives, or more of them for what takes as much of the stack.
class CompleteParser::Deeper {
 public:
  explicit Deeper(CompleteParser& parser, int levels = 1) : parser_(parser), levels_(levels) {
    if (parser.depth_ >= kMaxDepth) parser.Fail("too many nested expressions");
    parser.depth_ += levels;
  }
  ~Deeper() { parser_.depth_ -= levels_; }
  Deeper(const Deeper&) = delete;
  Deeper& operator=(const Deeper&) = delete;

 private:
  CompleteParser& parser_;
  const int levels_;
};

// Inside of a bracket for as long as it lives.
class CompleteParser::InBracket {
 public:
  explicit InBracket(CompleteParser& parser) : parser_(parser) { ++parser.brackets_; }
  ~InBracket() { --parser_.brackets_; }
  InBracket(const InBracket&) = delete;
  InBracket& operator=(const InBracket&) = delete;

 private:
  CompleteParser& parser_;
};

// Puts a value back when it goes.
template <class T>
class RestoredValue {
 public:
  RestoredValue(T& value, T inside) : value_(value), before_(value) { value = inside; }
  ~RestoredValue() { value_ = before_; }
  RestoredValue(const RestoredValue&) = delete;
  RestoredValue& operator=(const RestoredValue&) = delete;

 private:
  T& value_;
  T before_;
};

template <class Rule>
bool CompleteParser::Try(Rule&& rule) {
  if (failed_) return false;
  const size_t mark = nodes_.size();
  const size_t start = at_;
  const size_t waits = waits_.size();
  const size_t assigned = assigned_.size();
  const size_t banned = banned_.size();
  const RestoredValue<std::optional<ParseError>> postponed(postponed_, postponed_);
  const RestoredValue<Judge> judge(judge_, judge_);
  const RestoredValue<bool> trying(is_trying_, true);
  rule();
  const bool is_read = !failed_;
  furthest_ = std::max(furthest_, at_);
  waits_.resize(std::min(waits, waits_.size()));
  assigned_.resize(assigned);
  banned_.erase(banned_.begin() + static_cast<ptrdiff_t>(std::min(banned, banned_.size())), banned_.end());
  Revive(mark);
  at_ = start;
  return is_read;
}

template <class Rule>
void CompleteParser::InTypeScope(const char* name, Rule&& rule) {
  if (name == nullptr) return rule();
  const RestoredValue<const char*> type_scope(type_scope_, name);
  const size_t banned = banned_.size();
  const size_t waits = waits_.size();
  rule();
  JudgeTypeScope(banned, waits);
}

template <class T>
void CompleteParser::FinishBare(size_t mark) {
  if (failed_) return Collapse(mark);
  T* node = factory_.NewBare<T>();
  factory_.SetChildren(node, std::span<CNode* const>(nodes_).subspan(mark));
  nodes_.resize(mark);
  nodes_.push_back(node);
}

}  // namespace quillet
