// The class CutSource: the lines of a source one after another, each made when it is asked for, so that a host that is
// done with one before it takes the next works in the memory of few.
#include <array>
#include <exception>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/line_object.h"
#include "bindings/rows.h"
#include "lines/cutter.h"
#include "lines/scopes.h"

namespace quillet::host {
namespace {

class CutSource {
 public:
  CutSource(Any source, Any version_triple) {
    const HostText text = HostText::FromBytes(source);
    const Version version = VersionOf(version_triple);
    cut_ = new SharedCut(SourceText::Copy(text.text()));
    CutLines(*cut_->source, version, rows_);
  }

  // The next line with its place; a null object behind the last.
  nb::object Next() {
    if (next_ == rows_.size()) return {};
    const LineRow& row = rows_[next_++];
    LinePlace place;
    scopes_.Next(row, place);
    const nb::object line = NewLineObject(cut_, row);
    const nb::object first_line = Checked(nb::steal(PyLong_FromUnsignedLong(row.first_line)));
    const bool is_one_line = row.last_line == row.first_line;
    return Filled({line, first_line,
                   is_one_line ? first_line : Checked(nb::steal(PyLong_FromUnsignedLong(row.last_line))),
                   Checked(nb::steal(PyLong_FromUnsignedLong(row.indent))), TruthOf(place.in_async_def),
                   TruthOf(place.first_in_def)});
  }

 private:
  using Items = std::array<nb::object, 6>;

  static nb::object TruthOf(bool is_true) { return nb::borrow(is_true ? Py_True : Py_False); }

  // A tuple of the items: the last one with others in it, where nobody else has that any more. No cycle goes through
  // them, so the collector need not look at it if it has left off.
  nb::object Filled(Items items) {
    if (!tuple_.is_valid() || Py_REFCNT(tuple_.ptr()) != 1) {
      tuple_ = Checked(nb::steal(PyTuple_New(items.size())));
      for (size_t i = 0; i < items.size(); ++i) PyTuple_SET_ITEM(tuple_.ptr(), i, items[i].release().ptr());
      return tuple_;
    }
    nb::object filled = tuple_;
#if PY_VERSION_HEX >= 0x030E0000
    reinterpret_cast<PyTupleObject*>(filled.ptr())->ob_hash = -1;
#endif
    for (size_t i = 0; i < items.size(); ++i) {
      PyObject* const before = PyTuple_GET_ITEM(filled.ptr(), i);
      PyTuple_SET_ITEM(filled.ptr(), i, items[i].release().ptr());
      items[i] = nb::steal(before);
    }
    return filled;  // what was in it goes behind that, and may run the host's code
  }

  Ref<SharedCut> cut_;
  std::vector<LineRow> rows_;
  size_t next_ = 0;
  ScopeTracker scopes_;
  nb::object tuple_;
};

PyObject* NextOfCut(PyObject* self) {
  try {
    if (!nb::inst_ready(self)) ThrowError(ErrorKind::kTypeError, "the object was not initialised");
    return nb::inst_ptr<CutSource>(self)->Next().release().ptr();
  } catch (...) {
    SetHostError(std::current_exception());
    return nullptr;
  }
}

PyType_Slot kCutSlots[] = {{Py_tp_iter, reinterpret_cast<void*>(PyObject_SelfIter)},
                           {Py_tp_iternext, reinterpret_cast<void*>(NextOfCut)},
                           {0, nullptr}};

}  // namespace

void BindCutSource(nb::module_& host) {
  nb::class_<CutSource>(host, "CutSource", nb::type_slots(kCutSlots),
                        "The lines of a UTF-8 source, not yet analysed, for hosts that do that themselves: (logical, "
                        "first_line, last_line, indent, in_async_def, first_in_def), with lines from 0.")
      .def(nb::init<Any, Any>(), nb::arg("source"), nb::arg("version_triple"));
}

}  // namespace quillet::host
