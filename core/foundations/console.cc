// What the core does without a host: lines go to stdout, reports to stderr.
#include "foundations/console.h"

#include <cstdio>
#include <new>
#include <utility>

#include "foundations/errors.h"

namespace quillet {

namespace {

void PrintToStdout(Text line) {
  // One write a line, so that lines of several threads do not mix.
  std::string bytes(line);
  bytes += '\n';
  std::fwrite(bytes.data(), 1, bytes.size(), stdout);
}

void ReportToStderr(const std::exception_ptr& exception, bool /*suppress_gui*/) {
  std::string bytes = ReprOfException(exception);
  bytes += '\n';
  std::fwrite(bytes.data(), 1, bytes.size(), stderr);
}

std::string DescribeWithoutHost(const std::exception_ptr& exception) {
  try {
    std::rethrow_exception(exception);
  } catch (const std::bad_alloc&) {
    return "MemoryError()";
  } catch (...) {
    return {};
  }
}

thread_local Console* thread_console = nullptr;

}  // namespace

Console& TheConsole() {
  static Console console{PrintToStdout, ReportToStderr, DescribeWithoutHost};
  return thread_console != nullptr ? *thread_console : console;
}

ThreadConsole::ThreadConsole(Console* console) : before_(std::exchange(thread_console, console)) {}
ThreadConsole::~ThreadConsole() { thread_console = before_; }

}  // namespace quillet
