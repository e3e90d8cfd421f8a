// The operations of a line that the core calls and a host may see: an override of a Python subclass, or the built-in
// behaviour. See line_object.h.
#include <algorithm>
#include <limits>
#include <memory>

#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/line_class.h"
#include "bindings/line_object.h"

namespace quillet::host {
namespace {

// The operation of the instance's class where it is not that of CLogicalLine; null otherwise.
nb::object OverrideOf(PyObject* self, const LineClass::Operation& operation) {
  nb::object found = nb::steal(PyObject_GetAttr((PyObject*)Py_TYPE(self), operation.name));
  if (!found.is_valid()) throw nb::python_error();
  return found.ptr() == operation.builtin ? nb::object() : found;
}

// The half of a host's pair as bytes that the core may keep a moment.
Text BytesOfHalf(nb::handle half, HostText& keep) {
  keep = HostText::FromBytes(half);
  return keep.text();
}

}  // namespace

int LineObject::GetTokType(LogicalLine&, int64_t index) {
  if (is_python_subclass_) {
    return CallingHost([&] {
      nb::object override_op = OverrideOf(self_, g_line_class.get_tok_type);
      if (!override_op.is_valid()) return BuiltinGetTokType(index);
      return static_cast<int>(Int32Of(override_op(nb::handle(self_), index)));
    });
  }
  return CallingHost([&] { return BuiltinGetTokType(index); });
}

void LineObject::AppendTypeEquiv(LogicalLine&, Text name, Text equiv) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g_line_class.append) : nb::object();
    if (!override_op.is_valid()) return BuiltinAppend(name, equiv);
    override_op(nb::handle(self_), BytesOf(name), BytesOf(equiv));
  });
}

void LineObject::AppendArgTypeEquiv(LogicalLine&, Text name, Text info) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g_line_class.append_arg) : nb::object();
    if (!override_op.is_valid()) return BuiltinAppendArg(name, info);
    override_op(nb::handle(self_), BytesOf(name), BytesOf(info));
  });
}

void LineObject::SetParsed(LogicalLine&, bool parsed) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g_line_class.set_parsed) : nb::object();
    if (!override_op.is_valid()) {
      line_->parsed = parsed;
    } else {
      override_op(nb::handle(self_), parsed);
    }
  });
}

void LineObject::ClearDerivedInfo(LogicalLine&) {
  CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g_line_class.clear) : nb::object();
    if (!override_op.is_valid()) return BuiltinClearDerivedInfo();
    override_op(nb::handle(self_));
  });
}

EmbeddedLines LineObject::GetExpLogicals(LogicalLine& line) {
  return CallingHost([&] {
    nb::object override_op = is_python_subclass_ ? OverrideOf(self_, g_line_class.get_exp_logicals) : nb::object();
    if (!override_op.is_valid()) return line.DirectGetExpLogicals();
    nb::object result = override_op(nb::handle(self_));
    if (!PyTuple_Check(result.ptr())) ThrowExpected("tuple", result);
    EmbeddedLines embedded;
    const Py_ssize_t count = PyTuple_GET_SIZE(result.ptr());
    for (Py_ssize_t i = 0; i < count; ++i) {
      LineObject& element = LineOf(PyTuple_GET_ITEM(result.ptr(), i));
      element.MoveToOwnStore();  // its records come between those of this line
      embedded.lines.push_back(&element.line());
    }
    PyObject* tuple = result.release().ptr();
    embedded.keep_alive = std::shared_ptr<void>(tuple, [](void* object) { Py_DECREF(static_cast<PyObject*>(object)); });
    return embedded;
  });
}

void LineObject::CopyTypeEquivs(LogicalLine& from, LogicalLine& to) {
  CallingHost([&] {
    if (!equivs_.list.is_valid()) {
      // The line keeps its rows while the other one grows: both may write to one store.
      const std::span<const Record> rows = from.type_equivs();
      const std::vector<Record> copied(rows.begin(), rows.end());
      for (const Record& row : copied) to.AppendTypeEquiv(row.name(), row.info());
      return;
    }
    Extend(equivs_, from.type_equivs());
    nb::object list = equivs_.list;
    // A list that grows meanwhile (it may be that of the line that is copied to) is read to its old end.
    const Py_ssize_t count = PyList_GET_SIZE(list.ptr());
    for (Py_ssize_t i = 0; i < std::min(count, PyList_GET_SIZE(list.ptr())); ++i) {
      auto [name, equiv] = UnpackPair(PyList_GET_ITEM(list.ptr(), i));
      HostText keep_name, keep_equiv;
      const Text name_text = BytesOfHalf(name, keep_name);
      to.AppendTypeEquiv(name_text, BytesOfHalf(equiv, keep_equiv));
    }
  });
}

bool LineObject::GetHostArgRecords(LogicalLine& line, std::vector<std::pair<std::string, std::string>>& pairs) {
  if (!arg_equivs_.list.is_valid()) return false;
  CallingHost([&] {
    Extend(arg_equivs_, line.arg_type_equivs());
    nb::object list = arg_equivs_.list;
    for (Py_ssize_t i = 0; i < PyList_GET_SIZE(list.ptr()); ++i) {
      auto [name, info] = UnpackPair(PyList_GET_ITEM(list.ptr(), i));
      HostText keep_name, keep_info;
      const Text name_text = BytesOfHalf(name, keep_name);
      const Text info_text = BytesOfHalf(info, keep_info);
      pairs.emplace_back(name_text, info_text);
    }
  });
  return true;
}

bool LineObject::GetHostTokTypes(LogicalLine&, std::vector<int32_t>& types) {
  if (!has_host_tok_types_) return false;
  for (Py_ssize_t i = 0; i < PyList_GET_SIZE(tok_types_.ptr()); ++i) {
    PyObject* type = PyList_GET_ITEM(tok_types_.ptr(), i);
    int overflow = 0;
    const long number = PyLong_Check(type) ? PyLong_AsLongAndOverflow(type, &overflow) : -1;
    const bool is_type = overflow == 0 && number >= 0 && number <= std::numeric_limits<int32_t>::max();
    types.push_back(is_type ? static_cast<int32_t>(number) : -1);
  }
  return true;
}

}  // namespace quillet::host
