// Failures of the core: one small hierarchy that mirrors the host's builtin exceptions.
//
// A failure is thrown, carries its message, and is translated to the host's exception in one
// place of the bindings. Exceptions are for failures only; no hot path throws on good input.
#pragma once

#include <cstdint>
#include <exception>
#include <string>
#include <utility>

#include "foundations/text.h"

namespace quillet {

enum class ErrorKind : uint8_t {
  kTypeError,
  kValueError,
  kIndexError,
  kKeyError,
  kAttributeError,
  kAssertionError,
  kOverflowError,
  kNotImplementedError,
  kOSError,         // a file that cannot be read; the message names it
  kRuntimeError,    // a walk limit
  kRecursionError,  // the core's own bound on nesting; a RuntimeError to the host
  kParseError,      // ParseError below
  kSyntaxError,     // SyntaxError below
  kGrammarError,    // a grammar file that is not well formed or not LL(1); a ValueError to the host
};

class Error : public std::exception {
 public:
  Error(ErrorKind kind, std::string message) : kind_(kind), message_(std::move(message)) {}

  ErrorKind kind() const { return kind_; }
  const std::string& message() const { return message_; }
  const char* what() const noexcept override { return message_.c_str(); }
  // True for what stands for an exception of the host's, which can describe it.
  virtual bool is_of_host() const { return false; }

 private:
  ErrorKind kind_;
  std::string message_;
};

// What a node or an error points at: nothing, a token index, a position, or (only where the host
// put it there) an object of the host's, known to the core as a number.
struct Context {
  static constexpr int32_t kIndexTag = -1;
  static constexpr int32_t kNoneTag = -2;
  static constexpr int32_t kForeignTag = -3;

  int32_t value = 0;       // token index, line or foreign number
  int32_t col = kNoneTag;  // column of a position, or a tag

  static constexpr Context None() { return {}; }
  static constexpr Context Index(int32_t index) { return {index, kIndexTag}; }
  // A column below 0, which only a host can state, counts as 0: below it are the tags.
  static constexpr Context At(Position pos) { return {pos.line, pos.col < 0 ? 0 : pos.col}; }
  static constexpr Context Foreign(int32_t number) { return {number, kForeignTag}; }

  constexpr bool IsNone() const { return col == kNoneTag; }
  constexpr bool IsIndex() const { return col == kIndexTag; }
  constexpr bool IsPosition() const { return col >= 0; }
  constexpr bool IsForeign() const { return col == kForeignTag; }
  constexpr Position position() const { return {value, col}; }

  friend bool operator==(const Context&, const Context&) = default;
};

// A token that is not acceptable. `type` and `value` are what the host sees as the error's
// attributes; `type` is -1 where there is none.
class ParseError : public Error {
 public:
  ParseError(std::string message, int token_type, Text token, Context where)
      : Error(ErrorKind::kParseError, std::move(message)),
        type(token_type),
        has_value(!IsNone(token)),
        value(token),
        context(where) {}

  int type;
  bool has_value;
  std::string value;
  Context context;
  uint8_t needed = 0;  // code of the token without which the rule that was open cannot end; 0 where none is known
};

// Code that is rejected, in the form of the host's SyntaxError: line and offset count from 1, the
// offset in UTF-8 bytes.
class SyntaxError : public Error {
 public:
  // Which of the host's classes: that itself, or one of those that derive from it.
  enum class Kind : uint8_t { kSyntax, kIndentation, kTab };

  SyntaxError(std::string message, std::string file, int64_t line_from_1, int64_t offset_from_1, std::string line_text)
      : Error(ErrorKind::kSyntaxError, std::move(message)),
        filename(std::move(file)),
        lineno(line_from_1),
        offset(offset_from_1),
        text(std::move(line_text)) {}

  std::string filename;
  int64_t lineno;
  int64_t offset;
  std::string text;
  Kind error_class = Kind::kSyntax;
};

// Out-of-line throws keep the callers' hot paths small.
[[noreturn]] void ThrowError(ErrorKind kind, std::string message);

inline void Assert(bool condition, const char* message) {
  if (!condition) [[unlikely]]
    ThrowError(ErrorKind::kAssertionError, message);
}

// The name of the host's exception class for a kind, such as "ValueError".
const char* HostExceptionName(ErrorKind kind);

// The host's repr() of an exception: ValueError('...') for the core's own, the description by the
// host (see console.h) for any other.
std::string ReprOfException(const std::exception_ptr& exception);

// Text as the host's repr() writes it, with its choice of quotes.
std::string ReprOfText(Text text);

}  // namespace quillet
