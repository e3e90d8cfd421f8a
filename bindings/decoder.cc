// An exception that a source is to blame for is told with it; one that is meant to end the run ends it.
#include "bindings/decoder.h"

#include <algorithm>
#include <utility>

#include "bindings/convert.h"
#include "bindings/interpreter_lock.h"
#include "foundations/errors.h"
#include "foundations/utf8.h"

namespace quillet::host {

namespace {

// An exception as one line.
std::string LineOf(nb::python_error& error) {
  constexpr size_t kLongest = 200;
  std::string line;
  try {
    line = nb::str(error.type().attr("__name__")).c_str();
    if (const std::string message = nb::str(error.value()).c_str(); !message.empty()) line += ": " + message;
  } catch (const std::exception&) {  // it cannot even be described
    if (line.empty()) line = "an exception";
  }
  line.resize(std::min(line.size(), line.find_first_of("\r\n")));
  if (line.size() <= kLongest) return line;
  size_t size = kLongest;
  while (!IsUtf8LeadByte(line[size])) --size;
  return line.substr(0, size) + "\xE2\x80\xA6";
}

}  // namespace

bool Decoder::Decode(Text bytes, std::string& utf8) {
  const Locked lock;
  try {
    const nb::object answer = TupleOf(decode_(BytesOf(bytes)));
    if (nb::len(answer) != 2) ThrowError(ErrorKind::kTypeError, "a decoder gives a source and a reason");
    const nb::handle source = PyTuple_GET_ITEM(answer.ptr(), 0);
    const nb::handle reason = PyTuple_GET_ITEM(answer.ptr(), 1);
    utf8 = reason.is_none() ? HostText::FromBytes(source).text() : HostText::FromStr(reason).text();
    return reason.is_none();
  } catch (nb::python_error& error) {
    utf8 = Failed(error);
    return false;
  }
}

std::string Decoder::Failed(nb::python_error& error) {
  std::string line = LineOf(error);
  // What does not derive from Exception is meant to end the run.
  if (!failure_ && !error.matches(PyExc_Exception)) failure_.emplace(std::move(error));
  return line;
}

void Decoder::RaiseFailure() {
  if (!failure_) return;
  nb::python_error failure = std::move(*failure_);
  failure_.reset();
  throw std::move(failure);
}

}  // namespace quillet::host
