// CDispatchWalker: a walk driven by a table from node class to visit.
//
// A visit that gives true, or a class without an entry, has the node's children walked; a class
// marked as pruned is neither visited nor descended into, which keeps the walk of a large statement
// cheap. The walk is bounded as that of CNodeWalker is: 10000 visits, a depth of 40, measured on the
// stack of nodes, which visits may read to find ancestors. Reaching a limit prints a line and ends
// the walk normally, with what was recorded before.
#pragma once

#include <array>
#include <cstdint>
#include <vector>

#include "foundations/thread_use.h"
#include "lines/logical_line.h"
#include "tree/nodes.h"

namespace quillet {

class CDispatchWalker {
 public:
  enum class Action : uint8_t { kDescend, kPrune, kVisit };
  using Visit = bool (*)(CDispatchWalker& walker, CNode* node);

  // Visits of a host's. While a walker has them they decide for every node, in place of the table.
  class HostVisits {
   public:
    // Whether the children of the node, which may be null, are to be walked.
    virtual bool Visit(CNode* node) = 0;

   protected:
    ~HostVisits() = default;
  };

  // The table by exact class.
  struct Entry {
    Action action = Action::kDescend;
    Visit visit = nullptr;
  };
  using Table = std::array<Entry, kNodeKindCount>;

  // Copies the table.
  explicit CDispatchWalker(const Table& table) : table_(table) {}
  CDispatchWalker(const CDispatchWalker&) = delete;
  CDispatchWalker& operator=(const CDispatchWalker&) = delete;
  virtual ~CDispatchWalker() = default;

  // ValueError while another walk of this walker is under way. `first_in_def` is for derived walkers.
  virtual void Walk(CNode* node, LogicalLine* logical, bool first_in_def);
  void VisitNode(CNode* node);

  HostVisits* host_visits = nullptr;  // not owned

  LogicalLine* fLogical = nullptr;
  int32_t fVisitCount = 0;
  int32_t fRecurseCount = 0;
  int32_t fMaxVisits = 10000;
  int32_t fMaxRecurseCount = 40;
  std::vector<CNode*> fNodeStack;
  // For a host whose threads take turns: who is in the middle of an operation.
  ThreadUse thread_use;

 protected:
  [[noreturn]] static void ThrowTooManyVisits();
  [[noreturn]] static void ThrowTooDeep();

  // The frame of a walk: refuses a second one, prints what a RuntimeError says, and leaves the walker
  // idle whatever happens.
  template <class Visits>
  void RunWalk(LogicalLine* logical, Visits&& visits) {
    if (fLogical != nullptr) ThrowError(ErrorKind::kValueError, "Only one logical may be walked at a time");
    struct Idle {
      CDispatchWalker& walker;
      ~Idle() { walker.BecomeIdle(); }
    } idle{*this};
    fLogical = logical;
    fNodeStack.clear();
    try {
      visits();
    } catch (const Error& error) {
      PrintIfRuntimeError(error);
    }
  }

 private:
  void BecomeIdle();
  // Throws the error in flight on where it is another one.
  static void PrintIfRuntimeError(const Error& error);

  Table table_;
};

}  // namespace quillet
