// The entry of quillet.tarvex: defines its classes and exposes them to the host.
//
// The module's state (type objects, the map from nodes to their wrappers) is the process's, so it
// serves one interpreter: a load into a second one is an ImportError.
#include <string>

#include "bindings/bindings.h"

namespace quillet::host {
namespace {

constexpr const char* kOneInterpreter = "quillet.tarvex is in use by another interpreter of this process";

// True for the interpreter that loaded the module first.
bool IsOwner() {
  static PyInterpreterState* owner = PyInterpreterState_Get();
  return owner == PyInterpreterState_Get();
}

}  // namespace

nb::module_ SiblingModule(nb::module_& tarvex, const char* name) {
  auto child = [](nb::module_& parent, const char* child_name) {
    if (nb::hasattr(parent, child_name)) return nb::cast<nb::module_>(parent.attr(child_name));
    return parent.def_submodule(child_name);
  };
  nb::module_ siblings = child(tarvex, "_siblings");
  return child(siblings, name);
}

}  // namespace quillet::host

NB_MODULE(tarvex_in_owner, tarvex) {
  using namespace quillet::host;
  if (!IsOwner()) throw nb::import_error(kOneInterpreter);
  // Classes and shared objects are the process's and stay to its end on purpose.
  nb::set_leak_warnings(false);
  tarvex.attr("__doc__") = "Per-statement analysis of Python code.";
  BindErrors(tarvex);
  InstallConsole();
  BindStrutils(tarvex);
  BindFastaccess(tarvex);
  BindSymbolinfo(tarvex);
  BindLogicalline(tarvex);
  BindOptpgen(tarvex);
  BindNodes(tarvex);
  BindArgs(tarvex);
  BindFactory(tarvex);
  BindAccessors(tarvex);
  BindNodeFunctions(tarvex);
  BindText(tarvex);
  BindMatchcase(tarvex);
  BindParser(tarvex);
  BindWalker(tarvex);
  BindDispatch(tarvex);
  BindHints(tarvex);
  BindAnalysis(tarvex);
  BindHost(tarvex);
  BindRecordWords(tarvex);
  BindNames(tarvex);
  BindIndex(tarvex);
  BindBatch(tarvex);
  BindSite(tarvex);
}

extern "C" NB_EXPORT PyObject* PyInit_tarvex(void);
extern "C" PyObject* PyInit_tarvex(void) {
  if (!quillet::host::IsOwner()) {
    PyErr_SetString(PyExc_ImportError, quillet::host::kOneInterpreter);
    return nullptr;
  }
  return PyInit_tarvex_in_owner();
}
