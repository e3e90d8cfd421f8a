// Rows of Python objects from columns of the core: tuples that are filled field by field, and texts that
// become str once.
#pragma once

#include <vector>

#include "analysis/record_table.h"
#include "bindings/bindings.h"
#include "foundations/errors.h"
#include "foundations/text.h"

namespace quillet::host {

// The host's own error where making an object failed.
inline nb::object Checked(nb::object made) {
  if (!made.is_valid()) throw nb::python_error();
  return made;
}

// str of a text of a source. What is no UTF-8 is shown by escapes.
inline nb::object ShownText(Text text) {
  return nb::steal(PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "backslashreplace"));
}

// The texts of a list as str, each made when it is first asked for.
class ShownTexts {
 public:
  explicit ShownTexts(const TextList& texts) : texts_(texts) {}

  const nb::object& operator[](size_t i) {
    if (shown_.empty()) shown_.resize(texts_.size());
    nb::object& shown = shown_[i];
    if (!shown.is_valid()) shown = Checked(ShownText(texts_[i]));
    return shown;
  }

  nb::list All() {
    nb::list list;
    for (size_t i = 0; i < texts_.size(); ++i) list.append((*this)[i]);
    return list;
  }

 private:
  const TextList& texts_;
  std::vector<nb::object> shown_;
};

// A tuple under construction. Its size and type are the caller's affair.
class TupleFiller {
 public:
  TupleFiller(nb::handle type, Py_ssize_t size)
      : tuple_(Checked(nb::steal(reinterpret_cast<PyTypeObject*>(type.ptr())
                                     ->tp_alloc(reinterpret_cast<PyTypeObject*>(type.ptr()), size)))) {}

  void Add(nb::object value) { PyTuple_SET_ITEM(tuple_.ptr(), next_++, Checked(std::move(value)).release().ptr()); }
  void Add(size_t number) { Add(nb::steal(PyLong_FromSize_t(number))); }
  nb::object Take() { return std::move(tuple_); }

 private:
  nb::object tuple_;
  Py_ssize_t next_ = 0;
};

// TypeError for what is no class whose instances TupleFiller can make.
inline void CheckRowClass(nb::handle row_class) {
  if (!PyType_Check(row_class.ptr()) ||
      !PyType_IsSubtype(reinterpret_cast<PyTypeObject*>(row_class.ptr()), &PyTuple_Type))
    ThrowError(ErrorKind::kTypeError, "a class that derives from tuple is needed");
}

}  // namespace quillet::host
