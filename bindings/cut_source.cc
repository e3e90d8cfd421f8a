// The class CutSource: the lines of a source one after another, each made when it is asked for, so that a host that is
// done with one before it takes the next works in the memory of few.
#include <exception>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/line_object.h"
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
    return nb::make_tuple(NewLineObject(cut_, row), row.first_line, row.last_line, row.indent, place.in_async_def,
                          place.first_in_def);
  }

 private:
  Ref<SharedCut> cut_;
  std::vector<LineRow> rows_;
  size_t next_ = 0;
  ScopeTracker scopes_;
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
