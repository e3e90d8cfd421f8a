// The class CLogicalLine. It is made with the interpreter's own means: a host has one analysed for every statement, and
// what a bound class keeps track of for each of its instances costs more than telling a statement's records. The
// operations and fields that are not used for every line are bound to it as to any other class (bind_logicalline.cc).
#include <exception>
#include <new>

#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/line_class.h"
#include "bindings/line_object.h"

namespace quillet::host {
namespace {

LineObject& LineIn(PyObject* self) { return reinterpret_cast<LineInstance*>(self)->line; }

// What `call` gives, or `failure` with the host's error set.
template <class Result, class Call>
Result OrFailure(Result failure, Call&& call) {
  try {
    return call();
  } catch (...) {
    SetHostError(std::current_exception());
    return failure;
  }
}

PyObject* NewLine(PyTypeObject* type, PyObject*, PyObject*) {
  PyObject* const self = type->tp_alloc(type, 0);
  if (self == nullptr) return nullptr;
  new (&LineIn(self)) LineObject;
  return self;
}

int InitLine(PyObject* self, PyObject* args, PyObject* named) {
  static const char* const kNames[] = {"type",   "toks",       "positions",   "tok_types",
                                       "parsed", "first_line", "token_count", nullptr};
  PyObject *type = nullptr, *toks = nullptr, *positions = nullptr, *tok_types = nullptr, *parsed = nullptr,
           *first_line = nullptr, *token_count = nullptr;
  if (!PyArg_ParseTupleAndKeywords(args, named, "|OOOOOOO:CLogicalLine", const_cast<char**>(kNames), &type, &toks,
                                   &positions, &tok_types, &parsed, &first_line, &token_count))
    return -1;
  return OrFailure(-1, [&] {
    LineObject& line = LineIn(self);
    line.SetType(type != nullptr ? nb::borrow(type) : nb::str("unknown"));
    line.SetPositions(positions != nullptr ? nb::borrow(positions) : nb::tuple());
    line.SetToks(toks != nullptr ? nb::borrow(toks) : nb::tuple());
    if (tok_types != nullptr && tok_types != Py_None) line.SetTokTypes(tok_types);
    const int truth = parsed != nullptr ? PyObject_IsTrue(parsed) : 0;
    if (truth < 0) throw nb::python_error();
    line.line().parsed = truth != 0;
    line.line().first_line = first_line != nullptr ? Int32Of(first_line) : 0;
    if (token_count != nullptr && token_count != Py_None) line.SetTokenCount(Int32Of(token_count));
    line.Attach(self);
    return 0;
  });
}

void Deallocate(PyObject* self) {
  LineIn(self).~LineObject();
  PyTypeObject* const type = Py_TYPE(self);
  type->tp_free(self);
  Py_DECREF(type);
}

// ---- the record lists, which are read of every line ----

template <nb::object (LineObject::*Get)()>
PyObject* GetList(PyObject* self, void*) {
  return OrFailure<PyObject*>(nullptr, [&] { return (LineOf(self).*Get)().release().ptr(); });
}

template <void (LineObject::*Set)(nb::handle)>
int SetList(PyObject* self, PyObject* value, void*) {
  return OrFailure(-1, [&] {
    if (value == nullptr) ThrowError(ErrorKind::kAttributeError, "a record list cannot be deleted");
    (LineOf(self).*Set)(value);
    return 0;
  });
}

PyGetSetDef kLineFields[] = {
    {"fTypeEquivs", GetList<&LineObject::GetTypeEquivs>, SetList<&LineObject::SetTypeEquivs>,
     "Records of names in the statement's own scope: (name, info) in order of arrival, or None.", nullptr},
    {"fArgTypeEquivs", GetList<&LineObject::GetArgTypeEquivs>, SetList<&LineObject::SetArgTypeEquivs>,
     "Records of parameters of the scope that the statement opens, or None.", nullptr},
    {nullptr, nullptr, nullptr, nullptr, nullptr},
};

PyType_Slot kLineSlots[] = {
    {Py_tp_doc, const_cast<char*>("One logical line of Python: its tokens, and what analysis recorded on it.")},
    {Py_tp_new, reinterpret_cast<void*>(NewLine)},
    {Py_tp_init, reinterpret_cast<void*>(InitLine)},
    {Py_tp_dealloc, reinterpret_cast<void*>(Deallocate)},
    {Py_tp_getset, kLineFields},
    {0, nullptr},
};

PyType_Spec kLineSpec = {"quillet.logicalline.CLogicalLine", sizeof(LineInstance), 0,
                         Py_TPFLAGS_DEFAULT | Py_TPFLAGS_BASETYPE, kLineSlots};

}  // namespace

nb::object MakeLineClass() {
  nb::object made = nb::steal(PyType_FromSpec(&kLineSpec));
  if (!made.is_valid()) throw nb::python_error();
  g_line_class.line_type = reinterpret_cast<PyTypeObject*>(made.ptr());
  return made;
}

}  // namespace quillet::host
