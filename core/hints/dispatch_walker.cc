// The frame of a dispatched walk: limits, the stack of nodes, and an idle walker at every end.
#include "hints/dispatch_walker.h"

#include "foundations/console.h"

namespace quillet {

void CDispatchWalker::Walk(CNode* node, LogicalLine* logical, bool /*first_in_def*/) {
  RunWalk(logical, [&] { VisitNode(node); });
}

void CDispatchWalker::BecomeIdle() {
  fLogical = nullptr;
  fVisitCount = 0;
  fRecurseCount = 0;
  fNodeStack.clear();
}

void CDispatchWalker::PrintIfRuntimeError(const Error& error) {
  if (error.kind() != ErrorKind::kRuntimeError && error.kind() != ErrorKind::kRecursionError) throw;
  // The text names the symbol walker, as hosts know it.
  PrintLine("RuntimeError raised in CNodeWalker.Walk: " + error.message());
}

void CDispatchWalker::ThrowTooManyVisits() {
  ThrowError(ErrorKind::kRuntimeError, "Maximum number of calls to _VisitNode exceeded");
}

void CDispatchWalker::ThrowTooDeep() {
  ThrowError(ErrorKind::kRuntimeError, "Maximum recurse count in _VisitNode exceeded");
}

void CDispatchWalker::VisitNode(CNode* node) {
  if (++fVisitCount > fMaxVisits) ThrowTooManyVisits();
  fNodeStack.push_back(node);
  // The node stays on the stack; the end of the walk cleans up.
  if (static_cast<int64_t>(fNodeStack.size()) > fMaxRecurseCount) ThrowTooDeep();
  struct Pop {
    std::vector<CNode*>& stack;
    ~Pop() {
      if (!stack.empty()) stack.pop_back();
    }
  } pop{fNodeStack};

  bool descend;
  if (host_visits != nullptr) [[unlikely]] {
    descend = host_visits->Visit(node);
  } else {
    const Entry entry = node != nullptr ? table_[static_cast<size_t>(node->kind)] : Entry{};
    descend = entry.action == Action::kDescend || (entry.action == Action::kVisit && entry.visit(*this, node));
  }
  if (descend) {
    if (node == nullptr) ThrowError(ErrorKind::kAttributeError, "'NoneType' object has no attribute 'fChildren'");
    // By index: a visit of the host's may change the list.
    for (uint32_t i = 0; i < node->child_count; ++i) VisitNode(node->children[i]);
  }
  // Not made while an exception is in flight: a limit leaves the node that met it on the stack.
  Assert(!fNodeStack.empty() && fNodeStack.back() == node, "");
}

}  // namespace quillet
