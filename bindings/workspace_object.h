// A workspace as the host has it: one question at a time, without the interpreter lock, whichever threads ask.
#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <utility>

#include "bindings/bindings.h"
#include "bindings/interpreter_lock.h"
#include "bindings/language_object.h"
#include "bindings/signals.h"
#include "foundations/thread_use.h"
#include "workspace/questions.h"

namespace quillet::host {

class WorkspaceObject {
 public:
  // Sequences of paths as bytes, a path as bytes (empty for none), a version, lines of an ignore file as bytes, what
  // made the indexes that may be used, and what errors of syntax are found with.
  WorkspaceObject(nb::handle roots, nb::handle libraries, nb::handle typeshed, nb::handle version, nb::handle exclude,
                  nb::handle index_maker, const Language& language);

  // Calls `ask(workspace)` when no other thread does. Signals are heard meanwhile, and in front of it; a handler that
  // asks the same workspace is told that it cannot (RuntimeError).
  template <class Ask>
  auto Asked(Ask&& ask) {
    CheckNotAsking();
    const Unlocked unlocked;
    const std::unique_lock turn = TakeTurn();
    const Asking asking(*this);
    const ThreadStopQuestion signals(HandlesSignals());
    const ThreadStopQuestion stop([this] { CheckStop(); });
    for (int tries = 1;; ++tries) {
      try {
        if (tries > 1) workspace_->Refresh();
        return ask(*workspace_);
      } catch (const SourceChanged&) {
        // Asked again of the files as they are; where one changes all the time it is given up.
        workspace_->Recover();
        if (tries == kMostTries) throw;
      } catch (...) {
        workspace_->Recover();
        throw;
      }
    }
  }

  // For other threads: ends the question that is being answered, and those behind it, with quillet._workspace.Stopped
  // once this many seconds have passed since Proceed was called.
  void Stop(double patience);
  void Proceed();

  // "utf-8", "utf-16" or "utf-32": what columns count from now on.
  void SetColumnUnit(nb::handle name);

 private:
  // Which thread has its turn.
  struct Asking {
    explicit Asking(WorkspaceObject& object) : of(object) { of.asking_ = ThreadUse::ThisThread(); }
    ~Asking() { of.asking_ = nullptr; }
    Asking(const Asking&) = delete;
    Asking& operator=(const Asking&) = delete;
    WorkspaceObject& of;
  };

  static constexpr int kMostTries = 4;

  void CheckNotAsking() const;
  void CheckStop() const;
  std::unique_lock<std::timed_mutex> TakeTurn();

  std::timed_mutex mutex_;
  std::atomic<const void*> asking_{nullptr};
  using Clock = std::chrono::steady_clock;
  std::atomic<Clock::time_point> proceeded_{Clock::time_point::min()};
  std::atomic<Clock::time_point> stops_at_{Clock::time_point::max()};
  std::unique_ptr<Workspace> workspace_;
};

// Its class, and what finds the libraries of an environment.
void BindQuestions(nb::module_& host);
void BindShapes(nb::class_<WorkspaceObject>& workspace);
void BindEnvironment(nb::module_& host);

}  // namespace quillet::host
