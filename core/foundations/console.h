// What the core asks of the process it runs in: to print a line, to report an exception that has
// no other way out, to describe an exception that is not the core's own, and to put another one in
// its place.
//
// Without a host the lines go to stdout and stderr. The bindings install the host's own means at
// import; they are functions, so that a thread without the interpreter lock may call them (the
// host's versions take the lock).
#pragma once

#include <exception>
#include <string>

#include "foundations/text.h"

namespace quillet {

struct Console {
  // One line, without its line end, on the host's standard output.
  void (*print_line)(Text line);
  // Logs the exception; with `suppress_gui` the user is not shown it.
  void (*report_exception)(const std::exception_ptr& exception, bool suppress_gui);
  // repr() of an exception that is not a quillet::Error; empty where it is unknown.
  std::string (*describe_exception)(const std::exception_ptr& exception);
  // Raises a ValueError with this message from where the failure came from, and gives what was raised;
  // null where the host lets it pass. Without a host there is none.
  std::exception_ptr (*replace_exception)(const std::string& message, const std::exception_ptr& failure) = nullptr;
};

// The console of the calling thread where it has one of its own, and of the process otherwise.
Console& TheConsole();

// Makes `console` that of the calling thread while this lives.
class ThreadConsole {
 public:
  explicit ThreadConsole(Console* console);
  ~ThreadConsole();
  ThreadConsole(const ThreadConsole&) = delete;
  ThreadConsole& operator=(const ThreadConsole&) = delete;

 private:
  Console* before_;
};

inline void PrintLine(Text line) { TheConsole().print_line(line); }

}  // namespace quillet
