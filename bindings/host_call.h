// The host may do anything, at any time: the one place that makes it safe.
//
// Code of the host's runs in the middle of what the core does: where the core calls it (an overridden operation of a
// line, a visit, an engine, print), where an argument is converted (`__index__`, an iterator), and where an object is
// made or let go of (the collector, `__del__`, the callback of a weak reference). There it may give back the tree that
// is walked, parse others, change every list, and drop every line, walker and analyzer.
//
// The rule: what an operation may have in hand is neither freed nor used for something else before it is over.
//
//   Operation      An entry of the bindings that has the core work on nodes or lines declares one, before it converts
//                  its arguments, or gets it from DefOperation.
//   HostCall       Around a call that the core itself makes; CallingHost also translates what the host raises.
//   LetGo          What the bindings give up (a source, a store, positions, a line, a pool) goes through it: at once
//                  where nothing is under way, with the end of the outermost operation otherwise. The pools of nodes
//                  ask IsUnderWay themselves (NodePool::is_core_waiting), and the registry of wrappers looks for nodes
//                  and sources that nobody reaches only while nothing is under way.
//   WithoutCollector   Around code that makes the host's objects out of what the core shows and has a view in hand.
//   OneThread      An operation that another thread is in the middle of is refused to all others: a RuntimeError.
//
// What the host gave as an argument needs none of this: whoever called the binding holds it.
#pragma once

#include <atomic>
#include <memory>
#include <type_traits>
#include <utility>

#include "bindings/bindings.h"
#include "bindings/errors.h"
#include "bindings/interpreter_lock.h"
#include "foundations/ref.h"
#include "foundations/thread_use.h"

namespace quillet::host {

namespace under_way {

// How many operations and calls of the host's are under way, in all threads. Changed with the interpreter lock held,
// and read without it by threads that have no host, which may then keep memory a little longer.
inline std::atomic<int> count{0};
inline bool keeps_something = false;

inline void Add(int change) { count.store(count.load(std::memory_order_relaxed) + change, std::memory_order_relaxed); }

// Lets go of what was kept; the host's code may run then.
void Release();

}  // namespace under_way

inline bool IsUnderWay() { return under_way::count.load(std::memory_order_relaxed) > 0; }
// The same for an operation that has just begun, itself left out.
inline bool IsAnotherUnderWay() { return under_way::count.load(std::memory_order_relaxed) > 1; }

class HostCall {
 public:
  HostCall() { under_way::Add(1); }
  ~HostCall() {
    WaitIfThreadWasEnded();
    under_way::Add(-1);
  }
  HostCall(const HostCall&) = delete;
  HostCall& operator=(const HostCall&) = delete;
};

class Operation {
 public:
  Operation() { under_way::Add(1); }
  ~Operation() {
    under_way::Add(-1);
    if (under_way::keeps_something && !IsUnderWay()) [[unlikely]]
      under_way::Release();
  }
  Operation(const Operation&) = delete;
  Operation& operator=(const Operation&) = delete;
};

// Runs `call`, which enters the host.
template <class Call>
auto CallingHost(Call&& call) {
  const HostCall under_way;
  try {
    return call();
  } catch (nb::python_error& error) {
    RethrowForCore(error);
  }
}

// ---- giving up ----

// Keeps something until the outermost operation is over.
void KeepForOperation(std::shared_ptr<const void> thing);

template <class T>
void LetGo(T&& thing) {
  static_assert(!std::is_lvalue_reference_v<T>, "what is given up is moved from");
  if (IsUnderWay()) {
    KeepForOperation(std::make_shared<const std::decay_t<T>>(std::forward<T>(thing)));
  } else {
    [[maybe_unused]] const std::decay_t<T> gone(std::forward<T>(thing));
  }
}
// What others hold needs no keeping.
template <class T>
void LetGo(Ref<T>&& ref) {
  Ref<T> gone(std::move(ref));
  if (gone && gone->IsUnique() && IsUnderWay()) KeepForOperation(std::make_shared<const Ref<T>>(std::move(gone)));
}

// ---- making objects of the host's ----

class WithoutCollector {
 public:
  WithoutCollector() : was_on_(PyGC_Disable()) {}
  ~WithoutCollector() {
    if (was_on_) PyGC_Enable();
  }
  WithoutCollector(const WithoutCollector&) = delete;
  WithoutCollector& operator=(const WithoutCollector&) = delete;

 private:
  const int was_on_;
};

// ---- threads ----

// Claims an object of the core for this thread while it lives. RuntimeError "<what> is in use by another thread" where
// one is in the middle of an operation on it; the same thread may come back to it.
class OneThread {
 public:
  OneThread(ThreadUse& use, const char* what, const void* self = ThreadUse::ThisThread()) : use_(use) {
    if (!use.Enter(self)) ThrowInUse(what);
  }
  ~OneThread() { use_.Leave(); }
  OneThread(const OneThread&) = delete;
  OneThread& operator=(const OneThread&) = delete;

 private:
  [[noreturn]] static void ThrowInUse(const char* what);

  ThreadUse& use_;
};

// ---- definitions ----

// Defines an operation of a class or module.
template <class Scope, class Function, class... Extra>
void DefOperation(Scope& scope, const char* name, Function&& function, const Extra&... extra) {
  scope.def(name, std::forward<Function>(function), nb::call_guard<Operation>(), extra...);
}

}  // namespace quillet::host
