// A workspace as the host has it: one question at a time, without the interpreter lock, whichever threads ask.
#pragma once

#include <atomic>
#include <memory>
#include <mutex>
#include <utility>

#include "bindings/bindings.h"
#include "bindings/interpreter_lock.h"
#include "bindings/signals.h"
#include "foundations/thread_use.h"
#include "workspace/questions.h"

namespace quillet::host {

class WorkspaceObject {
 public:
  // Sequences of paths as bytes, a path as bytes (empty for none) and a version.
  WorkspaceObject(nb::handle roots, nb::handle libraries, nb::handle typeshed, nb::handle version);

  // Calls `ask(workspace)` when no other thread does. Signals are heard meanwhile, and in front of it; a handler that
  // asks the same workspace is told that it cannot (RuntimeError).
  template <class Ask>
  auto Asked(Ask&& ask) {
    CheckNotAsking();
    const Unlocked unlocked;
    const std::unique_lock turn = TakeTurn();
    const Asking asking(*this);
    const ThreadStopQuestion signals(HandlesSignals());
    try {
      return ask(*workspace_);
    } catch (...) {
      workspace_->Recover();
      throw;
    }
  }

 private:
  // Which thread has its turn.
  struct Asking {
    explicit Asking(WorkspaceObject& object) : of(object) { of.asking_ = ThreadUse::ThisThread(); }
    ~Asking() { of.asking_ = nullptr; }
    Asking(const Asking&) = delete;
    Asking& operator=(const Asking&) = delete;
    WorkspaceObject& of;
  };

  void CheckNotAsking() const;
  std::unique_lock<std::timed_mutex> TakeTurn();

  std::timed_mutex mutex_;
  std::atomic<const void*> asking_{nullptr};
  std::unique_ptr<Workspace> workspace_;
};

// Its class, and what finds the libraries of an environment.
void BindQuestions(nb::module_& host);
void BindEnvironment(nb::module_& host);

}  // namespace quillet::host
