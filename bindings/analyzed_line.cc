// The class AnalyzedLine. It is made with the interpreter's own means: sources have many lines, and what a bound class
// keeps track of for each of its instances costs more than all that most lines hold.
#include <algorithm>
#include <exception>

#include "bindings/analyzed_source.h"
#include "bindings/errors.h"
#include "bindings/rows.h"

namespace quillet::host {
namespace {

struct AnalyzedLine {
  PyObject_HEAD;
  PyObject* owner;  // the host's object of the source
  const AnalyzedSource* source;
  size_t index;
  // Made when they are first read.
  PyObject* records;
  PyObject* logical;
  PyObject* error;
};

PyTypeObject* g_analyzed_line;

AnalyzedLine* LineAt(PyObject* self) { return reinterpret_cast<AnalyzedLine*>(self); }

PyObject* NewReference(PyObject* object) {
  Py_INCREF(object);
  return object;
}

PyObject* FirstLine(PyObject* self, void*) {
  return PyLong_FromSize_t(size_t{LineAt(self)->source->row(LineAt(self)->index).first_line} + 1);
}
PyObject* LastLine(PyObject* self, void*) {
  return PyLong_FromSize_t(size_t{LineAt(self)->source->row(LineAt(self)->index).last_line} + 1);
}
PyObject* Indent(PyObject* self, void*) {
  return PyLong_FromSize_t(LineAt(self)->source->row(LineAt(self)->index).indent);
}
PyObject* InAsyncDef(PyObject* self, void*) {
  return PyBool_FromLong(LineAt(self)->source->result(LineAt(self)->index).in_async_def);
}
PyObject* FirstInDef(PyObject* self, void*) {
  return PyBool_FromLong(LineAt(self)->source->result(LineAt(self)->index).first_in_def);
}

// What `make` gives, once.
template <class Make>
PyObject* Kept(PyObject* AnalyzedLine::*place, PyObject* self, Make&& make) {
  AnalyzedLine* const line = LineAt(self);
  if (line->*place == nullptr) {
    try {
      nb::object made = make(*line->source, line->index);
      // The host's code may have run, and have read the same.
      if (line->*place == nullptr) line->*place = made.release().ptr();
    } catch (...) {
      SetHostError(std::current_exception());
      return nullptr;
    }
  }
  return NewReference(line->*place);
}

// A line with an object that may refer to anything is one that the collector has to look at.
void Track(PyObject* self) {
  if (!PyObject_GC_IsTracked(self)) PyObject_GC_Track(self);
}

PyObject* Records(PyObject* self, void*) {
  return Kept(&AnalyzedLine::records, self,
              [](const AnalyzedSource& source, size_t index) { return source.RecordsOf(index); });
}
PyObject* Logical(PyObject* self, void*) {
  Track(self);
  return Kept(&AnalyzedLine::logical, self,
              [](const AnalyzedSource& source, size_t index) { return source.LogicalOf(index); });
}
PyObject* ErrorOfLine(PyObject* self, void*) {
  if (LineAt(self)->source->result(LineAt(self)->index).error < 0) return NewReference(Py_None);
  Track(self);
  return Kept(&AnalyzedLine::error, self,
              [](const AnalyzedSource& source, size_t index) { return source.ErrorOf(index); });
}

int Traverse(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  Py_VISIT(LineAt(self)->owner);
  Py_VISIT(LineAt(self)->records);
  Py_VISIT(LineAt(self)->logical);
  Py_VISIT(LineAt(self)->error);
  return 0;
}

// The source stays: what is left of a line may still be read.
int Clear(PyObject* self) {
  Py_CLEAR(LineAt(self)->records);
  Py_CLEAR(LineAt(self)->logical);
  Py_CLEAR(LineAt(self)->error);
  return 0;
}

void Deallocate(PyObject* self) {
  if (PyObject_GC_IsTracked(self)) PyObject_GC_UnTrack(self);
  Clear(self);
  Py_CLEAR(LineAt(self)->owner);
  PyTypeObject* const type = Py_TYPE(self);
  type->tp_free(self);
  Py_DECREF(type);
}

PyGetSetDef kLineFields[] = {
    {"first_line", FirstLine, nullptr, "The number of its first physical line, from 1.", nullptr},
    {"last_line", LastLine, nullptr, "That of its last one.", nullptr},
    {"indent", Indent, nullptr, "The width of the indentation, tabs to multiples of 8.", nullptr},
    {"in_async_def", InAsyncDef, nullptr, "Whether it stands directly in the body of an `async def`.", nullptr},
    {"first_in_def", FirstInDef, nullptr, "Whether it is the first of a function's body.", nullptr},
    {"error", ErrorOfLine, nullptr, "Its SyntaxError, or None.", nullptr},
    {"logical", Logical, nullptr, "The core's own record of the line.", nullptr},
    {"records", Records, nullptr, "What the line says of names, in the order in which it was found.", nullptr},
    {nullptr, nullptr, nullptr, nullptr, nullptr},
};

PyType_Slot kLineSlots[] = {
    {Py_tp_doc, const_cast<char*>("A line of an analysed source. MakeLines makes them.")},
    {Py_tp_getset, kLineFields},
    {Py_tp_traverse, reinterpret_cast<void*>(Traverse)},
    {Py_tp_clear, reinterpret_cast<void*>(Clear)},
    {Py_tp_dealloc, reinterpret_cast<void*>(Deallocate)},
    {0, nullptr},
};

PyType_Spec kLineSpec = {
    "quillet.tarvex._host.AnalyzedLine", sizeof(AnalyzedLine), 0,
    Py_TPFLAGS_DEFAULT | Py_TPFLAGS_BASETYPE | Py_TPFLAGS_HAVE_GC | Py_TPFLAGS_DISALLOW_INSTANTIATION, kLineSlots};

}  // namespace

nb::list MakeLines(nb::handle owner, const AnalyzedSource& source, const nb::list& lines, size_t begin, size_t end,
                   nb::handle line_class) {
  if (lines.size() != source.size()) ThrowError(ErrorKind::kTypeError, "a list with a place a line is needed");
  auto* const type = reinterpret_cast<PyTypeObject*>(line_class.ptr());
  if (!PyType_Check(line_class.ptr()) || !PyType_IsSubtype(type, g_analyzed_line))
    ThrowError(ErrorKind::kTypeError, "a class that derives from AnalyzedLine is needed");
  const bool holds_nothing_else = type->tp_basicsize == sizeof(AnalyzedLine);
  end = std::min(end, source.size());
  begin = std::min(begin, end);
  nb::list made;
  for (size_t i = begin; i < end; ++i) {
    nb::object line = nb::borrow(PyList_GET_ITEM(lines.ptr(), i));
    if (line.is_none()) {
      line = Checked(nb::steal(type->tp_alloc(type, 0)));
      LineAt(line.ptr())->owner = NewReference(owner.ptr());
      LineAt(line.ptr())->source = &source;
      LineAt(line.ptr())->index = i;
      // No cycle goes through it yet.
      if (holds_nothing_else) PyObject_GC_UnTrack(line.ptr());
    }
    made.append(line);
    // Whenever an object is made, the host's code may run.
    if (lines.size() != source.size()) ThrowError(ErrorKind::kRuntimeError, "the list has changed");
    lines[i] = line;
  }
  return made;
}

void BindAnalyzedLine(nb::module_& host) {
  g_analyzed_line = reinterpret_cast<PyTypeObject*>(Checked(nb::steal(PyType_FromSpec(&kLineSpec))).release().ptr());
  host.attr("AnalyzedLine") = nb::handle(reinterpret_cast<PyObject*>(g_analyzed_line));
}

}  // namespace quillet::host
