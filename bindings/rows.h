// Rows of Python objects from columns of the core: tuples that are filled field by field, and texts that
// become str once.
#pragma once

#include <utility>
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

 private:
  const TextList& texts_;
  std::vector<nb::object> shown_;
};

// A tuple under construction. It is made with all values at hand: the host's code may run whenever an object is made,
// and could find a tuple that lacks some.
class TupleFiller {
 public:
  // `type` is tuple, or passes CheckRowClass.
  TupleFiller(nb::handle type, size_t size) : type_(reinterpret_cast<PyTypeObject*>(type.ptr())) {
    values_.reserve(size);
  }

  void Add(nb::object value) { values_.push_back(Checked(std::move(value))); }
  void Add(size_t number) { Add(nb::steal(PyLong_FromSize_t(number))); }
  nb::object Take() {
    nb::object tuple = Checked(nb::steal(type_->tp_alloc(type_, static_cast<Py_ssize_t>(values_.size()))));
    for (size_t i = 0; i < values_.size(); ++i) PyTuple_SET_ITEM(tuple.ptr(), i, values_[i].release().ptr());
    return tuple;
  }

 private:
  PyTypeObject* type_;
  std::vector<nb::object> values_;
};

// TypeError for what is no class whose instances TupleFiller can make. The interpreter itself says whether a class is
// laid out as tuple is: one of named fields that it made, such as os.stat_result, is not.
inline void CheckRowClass(nb::handle row_class) {
  if (!PyType_Check(row_class.ptr()) ||
      !PyType_IsSubtype(reinterpret_cast<PyTypeObject*>(row_class.ptr()), &PyTuple_Type))
    ThrowError(ErrorKind::kTypeError, "a class that derives from tuple is needed");
  if (row_class.ptr() != reinterpret_cast<PyObject*>(&PyTuple_Type))
    nb::handle(&PyTuple_Type).attr("__new__")(row_class);
}

}  // namespace quillet::host
