// The entry of quillet.tarvex: defines its classes and exposes them to the host.
//
// The module's state (type objects, the map from nodes to their wrappers) is the process's, so it serves
// one interpreter, the main one: a load into any other is an ImportError, whichever comes first. It is refused
// in front of nanobind's own beginnings, which would turn this library's view of the types to that interpreter's.
#include <string>
#include <vector>

#include "bindings/bindings.h"

namespace quillet::host {
namespace {

constexpr const char* kMainAlone = "quillet.tarvex serves the main interpreter of a process alone";

// 0 in the main interpreter; elsewhere -1, with an ImportError.
int RequireMainInterpreter(PyObject* = nullptr) {
  if (PyInterpreterState_Get() == PyInterpreterState_Main()) return 0;
  PyErr_SetString(PyExc_ImportError, kMainAlone);
  return -1;
}

// Lets a module's execution begin with the question which interpreter it is for. From 3.13 on the definition is
// asked for in the main interpreter, whichever one loads the module.
void ExecuteInMainAlone(PyModuleDef& definition) {
  static std::vector<PyModuleDef_Slot> slots;
  if (!slots.empty()) return;
  slots.push_back({Py_mod_exec, reinterpret_cast<void*>(RequireMainInterpreter)});
  const PyModuleDef_Slot* slot = definition.m_slots;
  for (; slot->slot != 0; ++slot) slots.push_back(*slot);
  slots.push_back(*slot);
  definition.m_slots = slots.data();
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

NB_MODULE(tarvex_in_main, tarvex) {
  using namespace quillet::host;
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
  BindCorpus(tarvex);
  BindShard(tarvex);
  BindSite(tarvex);
  BindSyntax(tarvex);
  BindWorkspace(tarvex);
  BindJson(tarvex);
}

extern "C" NB_EXPORT PyObject* PyInit_tarvex(void);
extern "C" PyObject* PyInit_tarvex(void) {
  if (quillet::host::RequireMainInterpreter() != 0) return nullptr;
  PyObject* const definition = PyInit_tarvex_in_main();
  if (definition != nullptr) quillet::host::ExecuteInMainAlone(*reinterpret_cast<PyModuleDef*>(definition));
  return definition;
}
