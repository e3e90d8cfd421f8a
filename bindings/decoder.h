// The host's decoder of sources that name an encoding other than UTF-8, and what becomes of its exceptions.
#pragma once

#include <optional>
#include <string>

#include "bindings/bindings.h"
#include "foundations/text.h"

namespace quillet::host {

class Decoder {
 public:
  // `decode` gives (UTF-8, None) or (None, reason) for a source.
  explicit Decoder(nb::object decode) : decode_(std::move(decode)) {}

  // As FileWorker::Options has it. Takes the interpreter lock.
  bool Decode(Text bytes, std::string& utf8);

  // What an exception of the host's says of the file that it was raised for, in one line. One that is no Exception is
  // kept for RaiseFailure. Both want the interpreter lock.
  std::string Failed(nb::python_error& error);
  void RaiseFailure();

 private:
  nb::object decode_;
  std::optional<nb::python_error> failure_;
};

}  // namespace quillet::host
