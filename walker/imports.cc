// Imports are recorded from their accessors alone: their children are not walked, so that a dotted
// name of an import never reads as a use.
//
// import a.b.c binds a alone, and its record says so; import a.b.c as d tells d the whole name.

#include "siblings/symbolinfo/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {

void CNodeWalker::VisitImportNames(CImportNamesStmt* node) {
  for (const CAsName& item : node->GetAsNameList()) {
    const Text bound = item.has_as_name ? Text(item.as_name) : Text(item.module_name);
    const size_t dot = bound.find('.');
    const Text name = Keep(bound.substr(0, dot));
    AddKeptNameDefined(name);
    scratch_.assign(kImportPrefix).append(dot == Text::npos ? Text(item.module_name) : name);
    AddTypeEquiv(name, scratch_);
    if (item.has_as_name) {
      scratch_.assign(kImportAsNamePrefix).append(item.as_name);
      AddTypeEquiv(name, scratch_);
    }
  }
}

void CNodeWalker::VisitFromImport(CFromImportStmt* node) {
  scratch_.assign(kFromImportPrefix).append(node->GetFromString()).append(" ");
  const size_t from_size = scratch_.size();
  if (node->GetImportStar()) {
    // Which names are bound is not known here.
    scratch_.append("*");
    AddTypeEquiv("*", scratch_);
    return;
  }
  std::string as_info;
  for (const CAsName& item : node->GetAsNameList()) {
    const Text name = Keep(item.has_as_name ? item.as_name : item.module_name);
    AddKeptNameDefined(name);
    scratch_.resize(from_size);
    scratch_.append(item.module_name);
    AddTypeEquiv(name, scratch_);
    if (item.has_as_name) AddTypeEquiv(name, as_info.assign(kImportAsNamePrefix).append(name));
  }
}

}  // namespace quillet
