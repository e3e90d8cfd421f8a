// What the core asks while it works, answered by the host's signals.
#include "bindings/signals.h"

#include <chrono>

#include "bindings/interpreter_lock.h"

namespace quillet::host {

namespace {

// An interrupt that was taken back from the interpreter before its handler ran.
class Interrupted : public Stopped {};

// The host's own objects of the module _signal, kept to the end of the process.
struct Signals {
  PyObject* getsignal;
  PyObject* interrupt_number;
  PyObject* default_handler;
};
Signals g_signals;

bool InterruptsRaise() {
  const nb::object handler = nb::steal(PyObject_CallOneArg(g_signals.getsignal, g_signals.interrupt_number));
  if (!handler.is_valid()) PyErr_Clear();
  return handler.ptr() == g_signals.default_handler;
}

// For operations of the host's, which have the lock.
void EndWhereInterrupted() {
  if (!HasInterpreterLock() || !InterruptsRaise()) return;
  if (PyOS_InterruptOccurred()) throw Interrupted();
}

}  // namespace

void SetStopped(const std::exception_ptr& exception, void*) {
  try {
    std::rethrow_exception(exception);
  } catch (const StoppedByHost& stopped) {
    stopped.original->restore();
  } catch (const Interrupted&) {
    PyErr_SetNone(PyExc_KeyboardInterrupt);
  }
}

void HandleSignals() {
  const Locked lock;
  if (PyErr_CheckSignals() == 0) return;
  nb::python_error error;
  throw StoppedByHost(error);
}

StopQuestion HandlesSignals() {
  using Clock = std::chrono::steady_clock;
  static constexpr std::chrono::milliseconds kPause(100);
  return [next = Clock::now() + kPause]() mutable {
    if (Clock::now() < next) return;
    HandleSignals();
    next = Clock::now() + kPause;
  };
}

void InstallInterrupts() {
  const nb::module_ module = nb::module_::import_("_signal");
  const auto keep = [&module](const char* name) { return nb::object(module.attr(name)).release().ptr(); };
  g_signals = {keep("getsignal"), keep("SIGINT"), keep("default_int_handler")};
  nb::register_exception_translator(SetStopped);
  SetStopQuestion(EndWhereInterrupted);
}

}  // namespace quillet::host
