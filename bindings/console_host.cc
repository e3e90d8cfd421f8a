// What the core asks of its process, answered by the host: lines are printed with the host's print,
// so that capturing works, and failures are reported to quillet.reflect.
//
// Both are looked up when they are called: a host may replace them. A thread that runs without the
// interpreter lock takes it for the call.
#include <string>

#include "bindings/char_tables_host.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/interpreter_lock.h"
#include "bindings/signals.h"
#include "foundations/console.h"
#include "foundations/errors.h"

namespace quillet::host {
namespace {

void PrintWithHost(Text line) {
  const Locked lock;
  const HostCall under_way;
  try {
    nb::module_::import_("builtins").attr("print")(StrOf(line));
  } catch (nb::python_error& error) {
    // An interrupt that came meanwhile is no failure of the walk that has something to say.
    if (error.matches(PyExc_Exception)) throw;
    throw StoppedByHost(error);
  }
}

// Makes the exception the one that is being handled while it lives, as an except clause does.
class Handling {
 public:
  explicit Handling(const std::exception_ptr& exception) {
    PyErr_GetExcInfo(&type_, &value_, &traceback_);
    SetHostError(exception);
    PyObject *type, *value, *traceback;
    PyErr_Fetch(&type, &value, &traceback);
    PyErr_NormalizeException(&type, &value, &traceback);
    if (traceback != nullptr) PyException_SetTraceback(value, traceback);
    PyErr_SetExcInfo(type, value, traceback);
  }
  ~Handling() { PyErr_SetExcInfo(type_, value_, traceback_); }
  Handling(const Handling&) = delete;
  Handling& operator=(const Handling&) = delete;

 private:
  PyObject* type_ = nullptr;
  PyObject* value_ = nullptr;
  PyObject* traceback_ = nullptr;
};

void ReportToHost(const std::exception_ptr& exception, bool suppress_gui) {
  const Locked lock;
  const HostCall under_way;
  Handling handling(exception);
  nb::module_::import_("quillet.reflect").attr("ReportCurrentException")(nb::arg("suppress_gui") = suppress_gui);
}

std::string DescribeByHost(const std::exception_ptr& exception) {
  const Locked lock;
  const HostCall under_way;
  try {
    std::rethrow_exception(exception);
  } catch (const HostRuntimeError& error) {
    return nb::repr(error.original->value()).c_str();
  } catch (const HostParseError& error) {
    return nb::repr(error.original->value()).c_str();
  } catch (nb::python_error& error) {
    // What does not derive from Exception ends more than a walk; the core leaves it as it is.
    if (!error.matches(PyExc_Exception)) return {};
    return nb::repr(error.value()).c_str();
  } catch (const std::bad_alloc&) {
    return "MemoryError()";
  } catch (...) {
    return {};
  }
}

nb::object TracebackOf(const std::exception_ptr& exception) {
  nb::object traceback;
  try {
    std::rethrow_exception(exception);
  } catch (const HostRuntimeError& error) {
    traceback = error.original->traceback();
  } catch (nb::python_error& error) {
    traceback = error.traceback();
  } catch (...) {  // of the core, which has no lines of the host's
  }
  return traceback.is_valid() ? traceback : nb::none();
}

std::exception_ptr ReplaceByHost(const std::string& message, const std::exception_ptr& failure) {
  const Locked lock;
  try {
    CallingHost([&] {
      const nb::object error = nb::handle(PyExc_ValueError)(StrOf(message));
      nb::module_::import_("quillet.reflect").attr("RaiseWithTraceback")(error, TracebackOf(failure));
    });
    return nullptr;
  } catch (...) {
    return std::current_exception();
  }
}

}  // namespace

void InstallConsole() {
  InstallHostCharTables();
  Console& console = TheConsole();
  console.print_line = PrintWithHost;
  console.report_exception = ReportToHost;
  console.describe_exception = DescribeByHost;
  console.replace_exception = ReplaceByHost;
}

}  // namespace quillet::host
