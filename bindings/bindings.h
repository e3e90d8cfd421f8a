// The bindings, a file a subsystem, in the order in which module.cc calls them.
//
// A binding function converts its arguments, calls one operation of the core and converts the
// result; core errors become the host's exceptions in errors.cc alone. A sibling's names live in a
// module object of their own, quillet.tarvex._siblings.<name>, which python/quillet/<name>.py
// re-exports name by name.
#pragma once

#include <nanobind/nanobind.h>

namespace nb = nanobind;

namespace quillet::host {

// The module object quillet.tarvex._siblings.<name>, made on first use.
nb::module_ SiblingModule(nb::module_& tarvex, const char* name);

void BindErrors(nb::module_& tarvex);
void InstallConsole();
void BindStrutils(nb::module_& tarvex);
void BindFastaccess(nb::module_& tarvex);
void BindSymbolinfo(nb::module_& tarvex);
void BindLogicalline(nb::module_& tarvex);
void BindOptpgen(nb::module_& tarvex);
void BindNodes(nb::module_& tarvex);
void BindArgs(nb::module_& tarvex);
void BindFactory(nb::module_& tarvex);
void BindAccessors(nb::module_& tarvex);
void BindNodeFunctions(nb::module_& tarvex);
void BindText(nb::module_& tarvex);
void BindParser(nb::module_& tarvex);
void BindMatchcase(nb::module_& tarvex);
void BindWalker(nb::module_& tarvex);
void BindDispatch(nb::module_& tarvex);
void BindHints(nb::module_& tarvex);
void BindAnalysis(nb::module_& tarvex);
void BindHost(nb::module_& tarvex);
void BindRecordWords(nb::module_& tarvex);
void BindNames(nb::module_& tarvex);
void BindIndex(nb::module_& tarvex);
void BindBatch(nb::module_& tarvex);
void BindCorpus(nb::module_& tarvex);
void BindShard(nb::module_& tarvex);
void BindSite(nb::module_& tarvex);
void BindSyntax(nb::module_& tarvex);
void BindWorkspace(nb::module_& tarvex);
void BindJson(nb::module_& tarvex);

}  // namespace quillet::host
