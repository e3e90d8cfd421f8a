// Core errors become the host's exceptions here, and back; nowhere else.
//
//   quillet::Error by kind     the builtin of the same name (GrammarError: ValueError)
//   quillet::ParseError        optpgen.ParseError, with `context` an int or a (line, column) tuple
//   quillet::SyntaxError       SyntaxError(msg, (filename, lineno, offset, text))
//   nanobind::python_error     itself: what a host's operation raised goes through the core unchanged
//
// The way back matters where the core tells kinds of errors apart (a parse error, a syntax error, a
// walk limit): a call into the host is made through CallingHost (host_call.h).
#pragma once

#include <memory>
#include <utility>

#include "bindings/bindings.h"
#include "foundations/errors.h"

namespace quillet::host {

// The class optpgen.ParseError.
nb::handle ParseErrorClass();

// The host's exception object for a core error.
nb::object ExceptionFor(const SyntaxError& error);
nb::object ExceptionFor(const ParseError& error);

// A RuntimeError of the host's on its way through the core, which catches walk limits by kind, and a
// ParseError, which it places. Whoever lets one out to the host raises the original.
class HostRuntimeError : public Error {
 public:
  HostRuntimeError(std::string message, std::shared_ptr<nb::python_error> raised)
      : Error(ErrorKind::kRuntimeError, std::move(message)), original(std::move(raised)) {}
  bool is_of_host() const override { return true; }
  std::shared_ptr<nb::python_error> original;
};

class HostParseError : public ParseError {
 public:
  HostParseError(std::string message, Context where, std::shared_ptr<nb::python_error> raised)
      : ParseError(std::move(message), -1, kNoText, where), original(std::move(raised)) {}
  bool is_of_host() const override { return true; }
  std::shared_ptr<nb::python_error> original;
};

// Throws what the core shall see of an exception that a host's operation raised.
[[noreturn]] void RethrowForCore(nb::python_error& error);

// The SyntaxError object that a host's operation raised since the last call of TakeHostSyntaxError,
// if `error` came from it; otherwise a null object. An analysis returns that same object.
nb::object TakeHostSyntaxError(const SyntaxError& error);
void ForgetHostSyntaxError();

// Sets the host's error indicator for the exception that is being handled.
void SetHostError(const std::exception_ptr& exception);

// TypeError "Expected <want>, got <type of got>".
[[noreturn]] void ThrowExpected(const char* want, nb::handle got);

}  // namespace quillet::host
