// The records read out of argument lists and import statements: CArgInfo and CAsName.
#include <utility>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "tree/arg_info.h"

namespace quillet::host {
namespace {

struct ArgInfoObject {
  nb::object name = nb::none();
  nb::object value = nb::none();
  nb::object prefix = nb::none();
  nb::object type_expr = nb::none();
};

struct AsNameObject {
  nb::object module_name = nb::none();
  nb::object as_name = nb::none();
};

// A host's node may hold the record that it stands in.
int TraverseArg(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (!nb::inst_ready(self)) return 0;
  const ArgInfoObject& object = *nb::inst_ptr<ArgInfoObject>(self);
  Py_VISIT(object.name.ptr());
  Py_VISIT(object.value.ptr());
  Py_VISIT(object.prefix.ptr());
  Py_VISIT(object.type_expr.ptr());
  return 0;
}

int ClearArg(PyObject* self) {
  if (nb::inst_ready(self)) const ArgInfoObject gone = std::exchange(*nb::inst_ptr<ArgInfoObject>(self), {});
  return 0;
}

const PyType_Slot kArgSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseArg)},
                                 {Py_tp_clear, reinterpret_cast<void*>(ClearArg)},
                                 {0, nullptr}};

}  // namespace

nb::object WrapArg(const CArgInfo& arg, const Ref<SourceText>& source) {
  ArgInfoObject object;
  object.name = Wrap(arg.name, source);
  object.value = Wrap(arg.value, source);
  object.prefix = StrOf(arg.prefix);
  object.type_expr = Wrap(arg.type_expr, source);
  return nb::cast(std::move(object));
}

nb::object WrapUsedArgs(const UsedArgList& args, const Ref<SourceText>& source) {
  nb::list list;
  for (const CArgInfo& arg : args) list.append(WrapArg(arg, source));
  return list;
}

nb::object WrapArgList(const ArgList& args, const Ref<SourceText>& source) {
  if (Py_EnterRecursiveCall(" in a list of nested parameters")) throw nb::python_error();
  nb::list list;
  try {
    for (const ArgEntry& entry : args)
      list.append(entry.is_list ? WrapArgList(entry.list, source) : WrapArg(entry.arg, source));
  } catch (...) {
    Py_LeaveRecursiveCall();
    throw;
  }
  Py_LeaveRecursiveCall();
  return list;
}

nb::object WrapAsName(const CAsName& name) {
  AsNameObject object;
  object.module_name = StrOf(name.module_name);
  if (name.has_as_name) object.as_name = StrOf(name.as_name);
  return nb::cast(std::move(object));
}

CArgInfo ArgOf(nb::handle object) {
  ArgInfoObject* arg = InstanceOf<ArgInfoObject>(object);
  if (arg == nullptr) ThrowExpected("CArgInfo", object);
  CArgInfo result;
  result.name = NodeOrNull(arg->name);
  result.value = NodeOrNull(arg->value);
  result.type_expr = NodeOrNull(arg->type_expr);
  const HostText prefix = HostText::FromStr(arg->prefix, true);
  if (prefix.text() == "*") result.prefix = "*";
  if (prefix.text() == "**") result.prefix = "**";
  return result;
}

UsedArgList UsedArgsOf(nb::handle list) {
  if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
  UsedArgList args;
  for (nb::handle item : list) args.push_back(ArgOf(item));
  return args;
}

ArgList ArgListOf(nb::handle list) {
  if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
  if (Py_EnterRecursiveCall(" in a list of nested parameters")) throw nb::python_error();
  ArgList args;
  try {
    for (nb::handle item : list) {
      if (PyList_Check(item.ptr())) {
        args.emplace_back(ArgListOf(item));
      } else {
        args.emplace_back(ArgOf(item));
      }
    }
  } catch (...) {
    Py_LeaveRecursiveCall();
    throw;
  }
  Py_LeaveRecursiveCall();
  return args;
}

void BindArgs(nb::module_& m) {
  nb::class_<ArgInfoObject> arg(m, "CArgInfo", nb::type_slots(kArgSlots),
                                "One parameter of a definition, or one argument of a call.");
  arg.def(nb::init<>());
  const auto node_field = [&](const char* name, nb::object ArgInfoObject::*field) {
    arg.def_prop_rw(
        name, [field](ArgInfoObject& self) { return self.*field; },
        [field](ArgInfoObject& self, Any value) {
          if (!value.is_none()) CheckedRef(value);
          self.*field = nb::borrow(value);
        },
        nb::arg("value"));
  };
  node_field("name", &ArgInfoObject::name);
  node_field("value", &ArgInfoObject::value);
  node_field("type_expr", &ArgInfoObject::type_expr);
  arg.def_prop_rw(
      "prefix", [](ArgInfoObject& self) { return self.prefix; },
      [](ArgInfoObject& self, Any value) {
        HostText::FromStr(value, true);
        self.prefix = nb::borrow(value);
      },
      nb::arg("value"));

  nb::class_<AsNameObject> as_name(m, "CAsName", "One imported name, as written and as bound.");
  as_name.def(nb::init<>());
  const auto text_field = [&](const char* name, nb::object AsNameObject::*field) {
    as_name.def_prop_rw(
        name, [field](AsNameObject& self) { return self.*field; },
        [field](AsNameObject& self, Any value) {
          HostText::FromStr(value, true);
          self.*field = nb::borrow(value);
        },
        nb::arg("value"));
  };
  text_field("module_name", &AsNameObject::module_name);
  text_field("as_name", &AsNameObject::as_name);
}

}  // namespace quillet::host
