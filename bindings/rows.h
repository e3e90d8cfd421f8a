// Rows of Python objects from columns of the core: tuples that are filled field by field, and texts that
// become str once.
#pragma once

#include <array>
#include <cstring>
#include <memory>
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

// Short texts as str, the latest of which are kept: names and what is said of them come again and again.
class StrCache {
 public:
  nb::object Get(Text text) {
    if (text.empty() || text.size() > kLongest) return Checked(ShownText(text));
    nb::object& slot = slots_[SlotOf(text)];
    if (slot.is_valid() && IsText(slot.ptr(), text)) [[likely]]
      return slot;
    nb::object made = Checked(ShownText(text));
    // Others are told apart by more than their bytes.
    if (PyUnicode_IS_COMPACT_ASCII(made.ptr())) {
      const nb::object before = std::exchange(slot, made);
    }
    return made;
  }

 private:
  static constexpr size_t kLongest = 40;
  static constexpr int kSlotBits = 11;

  static bool IsText(PyObject* str, Text text) {
    return PyUnicode_GET_LENGTH(str) == static_cast<Py_ssize_t>(text.size()) &&
           std::memcmp(PyUnicode_DATA(str), text.data(), text.size()) == 0;
  }
  static size_t SlotOf(Text text) {
    uint64_t front = 0, back = 0;
    const size_t count = std::min(text.size(), sizeof front);
    std::memcpy(&front, text.data(), count);
    std::memcpy(&back, text.data() + text.size() - count, count);
    return static_cast<size_t>(((front ^ back * 31) + text.size()) * 0x9E3779B97F4A7C15u >> (64 - kSlotBits));
  }

  std::array<nb::object, size_t{1} << kSlotBits> slots_;
};

// A tuple under construction. It is made with all values at hand: the host's code may run whenever an object is made,
// and could find a tuple that lacks some.
class TupleFiller {
 public:
  // `type` is tuple, or passes CheckRowClass.
  TupleFiller(nb::handle type, size_t size) : type_(reinterpret_cast<PyTypeObject*>(type.ptr())) {
    if (size > few_.size()) many_.reset(new PyObject*[size]);
    values_ = many_ ? many_.get() : few_.data();
  }
  ~TupleFiller() {
    while (count_ > 0) Py_DECREF(values_[--count_]);
  }
  TupleFiller(const TupleFiller&) = delete;
  TupleFiller& operator=(const TupleFiller&) = delete;

  // At most as often as was said.
  void Add(nb::object value) { values_[count_++] = Checked(std::move(value)).release().ptr(); }
  void Add(size_t number) { Add(nb::steal(PyLong_FromSize_t(number))); }
  nb::object Take() {
    const auto size = static_cast<Py_ssize_t>(count_);
    // There is but one empty tuple: what is made of another one when it goes is not memory of the interpreter's.
    const bool is_plain = type_ == &PyTuple_Type;
    nb::object tuple = Checked(nb::steal(is_plain ? PyTuple_New(size) : type_->tp_alloc(type_, size)));
#if PY_VERSION_HEX >= 0x030E0000
    // Whoever makes one by its class says that its hash is not known yet.
    if (!is_plain) reinterpret_cast<PyTupleObject*>(tuple.ptr())->ob_hash = -1;
#endif
    for (size_t i = 0; i < count_; ++i) PyTuple_SET_ITEM(tuple.ptr(), i, values_[i]);
    count_ = 0;
    return tuple;
  }
  // The same for values that refer to nothing: no cycle goes through them, and the collector has nothing to look at.
  nb::object TakePlain() {
    nb::object tuple = Take();
    if (type_->tp_dictoffset == 0 && PyObject_GC_IsTracked(tuple.ptr())) PyObject_GC_UnTrack(tuple.ptr());
    return tuple;
  }

 private:
  PyTypeObject* type_;
  std::array<PyObject*, 12> few_;
  std::unique_ptr<PyObject*[]> many_;
  PyObject** values_;
  size_t count_ = 0;
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
