// The entry of quillet.tarvex: defines its classes and exposes them to the host.
//
// The module's state (type objects, the map from nodes to their wrappers) is the process's, so it serves
// one interpreter, the main one: a load into any other is an ImportError, whichever comes first.
#include <string>

#include "bindings/bindings.h"

namespace quillet::host {
namespace {

constexpr const char* kMainAlone = "quillet.tarvex serves the main interpreter of a process alone";

bool IsMainInterpreter() { return PyInterpreterState_Get() == PyInterpreterState_Main(); }

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

NB_MODULE(tarvex_in_main, tarvex) {
  using namespace quillet::host;
  if (!IsMainInterpreter()) throw nb::import_error(kMainAlone);
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
  BindWorkspace(tarvex);
}

extern "C" NB_EXPORT PyObject* PyInit_tarvex(void);
extern "C" PyObject* PyInit_tarvex(void) {
  if (!quillet::host::IsMainInterpreter()) {
    PyErr_SetString(PyExc_ImportError, quillet::host::kMainAlone);
    return nullptr;
  }
  return PyInit_tarvex_in_main();
}
