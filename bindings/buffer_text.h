// The bytes of any object with a buffer, without a copy.
#pragma once

#include "bindings/bindings.h"
#include "foundations/text.h"

namespace quillet::host {

// Holds the buffer of an object while this lives. What has none is a TypeError.
class BufferText {
 public:
  explicit BufferText(nb::handle object) {
    if (PyObject_GetBuffer(object.ptr(), &view_, PyBUF_SIMPLE) != 0) throw nb::python_error();
  }
  ~BufferText() { PyBuffer_Release(&view_); }
  BufferText(const BufferText&) = delete;
  BufferText& operator=(const BufferText&) = delete;

  Text text() const { return {static_cast<const char*>(view_.buf), static_cast<size_t>(view_.len)}; }

 private:
  Py_buffer view_;
};

}  // namespace quillet::host
