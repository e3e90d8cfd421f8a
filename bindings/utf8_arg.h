// UTF-8 bytes of a host's text, bytes or bytearray, and offsets into them.
#pragma once

#include "bindings/bindings.h"
#include "bindings/convert.h"

namespace quillet::host {

// The bytes of a str, bytes or bytearray, borrowed from it; any other type is a TypeError "Expected str, got ...". A
// bytearray keeps its size meanwhile, as under a memoryview: what is converted next may be the host's code.
class Utf8Arg {
 public:
  explicit Utf8Arg(nb::handle object) {
    if (PyByteArray_Check(object.ptr())) {
      if (PyObject_GetBuffer(object.ptr(), &buffer_, PyBUF_SIMPLE) != 0) throw nb::python_error();
      bytes_ = {static_cast<const char*>(buffer_.buf), static_cast<size_t>(buffer_.len)};
    } else {
      keep_ = HostText::FromStrOrBytes(object);
      bytes_ = keep_.text();
    }
  }
  ~Utf8Arg() {
    if (buffer_.obj != nullptr) PyBuffer_Release(&buffer_);
  }
  Utf8Arg(const Utf8Arg&) = delete;
  Utf8Arg& operator=(const Utf8Arg&) = delete;

  Text bytes() const { return bytes_; }
  const char* ptr() const { return bytes_.data(); }
  int64_t size() const { return static_cast<int64_t>(bytes_.size()); }
  // An end that a caller gave, at most that of the bytes: nothing is read behind them.
  int64_t End(nb::handle end_pos) const { return std::min(Int64Of(end_pos), size()); }

 private:
  Py_buffer buffer_{};  // of a bytearray
  Text bytes_;
  HostText keep_;
};

// A position to read at; IndexError for a negative one.
inline int64_t PositionOf(nb::handle pos) {
  const int64_t position = Int64Of(pos);
  if (position < 0) ThrowError(ErrorKind::kIndexError, "position in front of the text");
  return position;
}

// A byte as an int; OverflowError for one that is none.
inline char ByteOf(nb::handle byte) {
  const int64_t value = Int64Of(byte);
  if (value < 0 || value > 255) ThrowError(ErrorKind::kOverflowError, "value too large to convert to char");
  return static_cast<char>(value);
}

}  // namespace quillet::host
