// The interpreter lock, taken and let go of: by these classes and by nothing else in the bindings.
//
// Up to 3.13 a thread that wants the lock of an interpreter on its way out is ended where it stands, by
// unwinding its stack. That cannot pass through C++: a frame that lets no exception out, or a handler of all
// exceptions, aborts the process. So a thread that was ended waits here for the end of the process, as every
// such thread does from 3.14 on.
// The trap: whether a thread has the lock is not what PyGILState_Check says, which is always true once the
// process has had a second interpreter.
#pragma once

#include "bindings/bindings.h"

namespace quillet::host {

// Whether the calling thread has the lock.
bool HasInterpreterLock();

// For the end of a scope in which the host's code ran: does not come back where the thread was ended in it.
void WaitIfThreadWasEnded();

// With the lock while this lives, whether the thread has it or not.
class Locked {
 public:
  Locked();
  ~Locked();
  Locked(const Locked&) = delete;
  Locked& operator=(const Locked&) = delete;

 private:
  bool takes_;
  PyGILState_STATE state_{};
};

// Without the lock while this lives, whether the thread has it or not.
class Unlocked {
 public:
  Unlocked() : state_(HasInterpreterLock() ? PyEval_SaveThread() : nullptr) {}
  ~Unlocked();
  Unlocked(const Unlocked&) = delete;
  Unlocked& operator=(const Unlocked&) = delete;

 private:
  PyThreadState* state_;
};

// While this lives, the state that `Locked` makes for the calling thread stays: making one is slow, and up to 3.11 a
// fork in the middle of it may leave the child with a lock that nobody gives back. One a thread, and for threads of our
// own alone: it takes the lock at its end, and others wait with the lock held for the end of theirs.
class KeptThreadState {
 public:
  KeptThreadState();
  ~KeptThreadState();
  KeptThreadState(const KeptThreadState&) = delete;
  KeptThreadState& operator=(const KeptThreadState&) = delete;

 private:
  friend class Locked;
  // With the lock, behind the call that made the state.
  void Keep();

  bool is_kept_ = false;
};

}  // namespace quillet::host
