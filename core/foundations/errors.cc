// Throwing, naming and describing failures.
//
// What a failure looks like to a user is settled here: the host's class name for its kind, and the
// repr() that a printed limit line carries.
#include "foundations/errors.h"

#include <cstdio>

#include "foundations/char_tables.h"
#include "foundations/console.h"
#include "foundations/utf8.h"

namespace quillet {

void ThrowError(ErrorKind kind, std::string message) { throw Error(kind, std::move(message)); }

const char* HostExceptionName(ErrorKind kind) {
  switch (kind) {
    case ErrorKind::kTypeError:
      return "TypeError";
    case ErrorKind::kValueError:
    case ErrorKind::kGrammarError:
      return "ValueError";
    case ErrorKind::kIndexError:
      return "IndexError";
    case ErrorKind::kKeyError:
      return "KeyError";
    case ErrorKind::kAttributeError:
      return "AttributeError";
    case ErrorKind::kAssertionError:
      return "AssertionError";
    case ErrorKind::kOverflowError:
      return "OverflowError";
    case ErrorKind::kNotImplementedError:
      return "NotImplementedError";
    case ErrorKind::kOSError:
      return "OSError";
    case ErrorKind::kRuntimeError:
      return "RuntimeError";
    case ErrorKind::kRecursionError:
      return "RecursionError";
    case ErrorKind::kParseError:
      return "ParseError";
    case ErrorKind::kSyntaxError:
      return "SyntaxError";
  }
  return "Exception";
}

namespace {

void AppendHex(const char* format, uint32_t value, std::string& out) {
  char digits[16];
  out.append(digits, static_cast<size_t>(std::snprintf(digits, sizeof digits, format, value)));
}

void AppendEscape(uint32_t code_point, std::string& out) {
  if (code_point < 0x100) {
    AppendHex("\\x%02x", code_point, out);
  } else if (code_point < 0x10000) {
    AppendHex("\\u%04x", code_point, out);
  } else {
    AppendHex("\\U%08x", code_point, out);
  }
}

std::string ReprOfError(const Error& error) {
  std::string result = HostExceptionName(error.kind());
  result += '(';
  result += ReprOfText(error.message());
  if (const auto* syntax = dynamic_cast<const SyntaxError*>(&error)) {
    result += ", (" + ReprOfText(syntax->filename) + ", " + std::to_string(syntax->lineno) + ", " +
              std::to_string(syntax->offset) + ", " + ReprOfText(syntax->text) + ")";
  }
  result += ')';
  return result;
}

}  // namespace

std::string ReprOfException(const std::exception_ptr& exception) {
  if (!exception) return "None";
  try {
    std::rethrow_exception(exception);
  } catch (const Error& error) {
    const std::string description = error.is_of_host() ? TheConsole().describe_exception(exception) : "";
    return description.empty() ? ReprOfError(error) : description;
  } catch (const std::exception& other) {
    std::string description = TheConsole().describe_exception(exception);
    return description.empty() ? "Exception(" + ReprOfText(other.what()) + ")" : description;
  } catch (...) {
    std::string description = TheConsole().describe_exception(exception);
    return description.empty() ? "Exception()" : description;
  }
}

std::string ReprOfText(Text text) {
  const bool has_single = text.find('\'') != Text::npos;
  const bool has_double = text.find('"') != Text::npos;
  const char quote = has_single && !has_double ? '"' : '\'';
  std::string out(1, quote);
  const char* const end = text.data() + text.size();
  for (const char* at = text.data(); at < end;) {
    const auto byte = static_cast<unsigned char>(*at);
    if (byte < 0x80) {
      ++at;
      if (byte == static_cast<unsigned char>(quote) || byte == '\\') {
        out += '\\';
        out += static_cast<char>(byte);
      } else if (byte == '\n') {
        out += "\\n";
      } else if (byte == '\r') {
        out += "\\r";
      } else if (byte == '\t') {
        out += "\\t";
      } else if (byte < 0x20 || byte == 0x7f) {
        AppendEscape(byte, out);
      } else {
        out += static_cast<char>(byte);
      }
      continue;
    }
    const DecodedChar decoded = DecodeUtf8(at, end);
    if (decoded.length == 0) {  // The host never holds such a byte; show it as it is.
      AppendEscape(byte, out);
      ++at;
      continue;
    }
    if (CharClassOf(decoded.code_point) & kCharPrintable) {
      out.append(at, decoded.length);
    } else {
      AppendEscape(decoded.code_point, out);
    }
    at += decoded.length;
  }
  out += quote;
  return out;
}

}  // namespace quillet
