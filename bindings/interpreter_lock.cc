// A thread that is ended is noticed by a destructor: nothing but the unwinding of its stack runs one in front of
// the end of the call that takes the lock.
#include "bindings/interpreter_lock.h"

#include <chrono>
#include <thread>

namespace quillet::host {

namespace {

[[noreturn]] void WaitForEndOfProcess() {
  while (true) std::this_thread::sleep_for(std::chrono::hours(1));
}

PyThreadState* CurrentThreadState() {
#if PY_VERSION_HEX >= 0x030D0000
  return PyThreadState_GetUnchecked();
#else
  return _PyThreadState_UncheckedGet();
#endif
}

// Around a call that takes the lock.
class Taking {
 public:
  Taking() = default;
  ~Taking() {
    if (!taken) WaitForEndOfProcess();
  }
  Taking(const Taking&) = delete;
  Taking& operator=(const Taking&) = delete;

  bool taken = false;
};

// Takes the lock. In a frame of its own, behind which a compiler does not see: a destructor is allowed no
// exception, so an optimised one that holds `Taking` itself ends the process in front of it.
template <class Take>
[[gnu::noinline]] void TakeLock(Take take) {
  Taking taking;
  take();
  taking.taken = true;
}

// Of the calling thread.
thread_local KeptThreadState* kept_thread_state = nullptr;

}  // namespace

// Up to 3.11 the current state is that of whichever thread has the lock, later the calling thread's own.
bool HasInterpreterLock() {
  PyThreadState* const current = CurrentThreadState();
#if PY_VERSION_HEX >= 0x030C0000
  return current != nullptr;
#else
  return current != nullptr && current == PyGILState_GetThisThreadState();
#endif
}

void WaitIfThreadWasEnded() {
  if (!HasInterpreterLock()) [[unlikely]]
    WaitForEndOfProcess();
}

Locked::Locked() : takes_(!HasInterpreterLock()) {
  if (!takes_) return;
  if (!Py_IsInitialized()) WaitForEndOfProcess();
  const bool is_new = PyGILState_GetThisThreadState() == nullptr;
  TakeLock([this] { state_ = PyGILState_Ensure(); });
  if (is_new && kept_thread_state != nullptr) kept_thread_state->Keep();
}

Locked::~Locked() {
  WaitIfThreadWasEnded();
  if (!takes_) return;
  TakeLock([this] { PyGILState_Release(state_); });
}

KeptThreadState::KeptThreadState() { kept_thread_state = this; }

KeptThreadState::~KeptThreadState() {
  kept_thread_state = nullptr;
  if (!is_kept_) return;
  const Locked lock;
  PyGILState_Release(PyGILState_LOCKED);
}

void KeptThreadState::Keep() {
  PyGILState_Ensure();
  is_kept_ = true;
}

Unlocked::~Unlocked() {
  if (state_ == nullptr) return;
  TakeLock([this] { PyEval_RestoreThread(state_); });
}

}  // namespace quillet::host
