// Signals of the process while the core is at work: what ends a long operation before its end (stop.h).
//
// Work on objects that the host's code can reach (an operation of quillet.tarvex) runs no code of the host's in
// between, so only what needs none is looked for: an interrupt that would raise KeyboardInterrupt. A host that
// handles interrupts otherwise, and every other signal, waits for the end of the operation.
// Work on objects of nobody else's (a source of the host API, the files of a batch) runs the host's handlers,
// whatever they are, and ends where one of them raises.
#pragma once

#include <memory>

#include "bindings/bindings.h"
#include "foundations/stop.h"

namespace quillet::host {

// An exception of the host's that ends the core's work.
class StoppedByHost : public Stopped {
 public:
  explicit StoppedByHost(nb::python_error& error) : original(std::make_shared<nb::python_error>(std::move(error))) {}
  std::shared_ptr<nb::python_error> original;
};

// Runs the handlers of the signals that have arrived; throws StoppedByHost where one raises.
void HandleSignals();

// The question of a thread that works on objects of its own: HandleSignals, at most ten times a second.
StopQuestion HandlesSignals();

// Sets the host's error indicator for a Stopped.
void SetStopped(const std::exception_ptr& exception, void* = nullptr);

// Makes interrupts end the operations of quillet.tarvex.
void InstallInterrupts();

}  // namespace quillet::host
