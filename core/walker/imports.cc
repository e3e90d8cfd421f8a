// Imports are recorded from their accessors alone: their children are not walked, so that a dotted
// name of an import never reads as a use.
//
// import a.b.c binds a alone, and its record says so; import a.b.c as d tells d the whole name.

#include <string>
#include <utility>

#include "vocabulary/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {

// The dotted text of an imported name, kept: a view where its tokens stand side by side.
Text CNodeWalker::ImportedName(CNode* module) {
  if (module == nullptr) ThrowNoAttribute("fText");
  if (module->IsLeaf()) return Keep(module->fText());
  if (isa<CDottedName>(module) && module->child_count > 0) {
    bool side_by_side = true;
    for (uint32_t i = 0; i < module->child_count; ++i) {
      const CNode* child = module->children[i];
      side_by_side = side_by_side && child != nullptr && child->IsLeaf() &&
                     (i == 0 || child->text == module->children[i - 1]->text + module->children[i - 1]->text_length);
    }
    if (side_by_side) {
      const CNode* last = module->LastChild();
      const char* begin = module->children[0]->text;
      return Keep({begin, static_cast<size_t>(last->text + last->text_length - begin)});
    }
  }
  name_buffer_.clear();
  AppendTextForImportName({&module, 1}, name_buffer_);
  return Keep(name_buffer_);
}

void CNodeWalker::AddImportAsName(Text name) {
  scratch_.assign(kImportAsNamePrefix).append(name);
  AddStableTypeEquiv(name, Keep(scratch_));
}

void CNodeWalker::VisitImportNames(CImportNamesStmt* node) {
  ForEachAsName(node->GetNamesNode(), [this](const AsNameParts& parts) {
    const Text module = ImportedName(parts.module);
    const bool has_as_name = !IsNone(parts.as_name);
    const Text bound = has_as_name ? Keep(parts.as_name) : module;
    const size_t dot = bound.find('.');
    const Text name = bound.substr(0, dot);
    AddKeptNameDefined(name);
    scratch_.assign(kImportPrefix).append(dot == Text::npos ? module : name);
    AddStableTypeEquiv(name, Keep(scratch_));
    if (has_as_name) AddImportAsName(name);
  });
}

void CNodeWalker::VisitFromImport(CFromImportStmt* node) {
  // A host that sees a record may ask the walker for anything, so the text is out of the way of that;
  // its memory is used again.
  std::string from = std::move(from_buffer_);
  // Behind a head its place and its end were not looked at.
  met_doubtful_ |= is_complete_ && RequireLogical().kind != LineKind::kFromImport;
  from.assign(kFromImportPrefix);
  AppendTextForImportName(node->FromNodes(), from);
  from.append(" ");
  if (node->GetImportStar()) {
    // Which names are bound is not known here.
    from.append("*");
    AddStableTypeEquiv("*", Keep(from));
    from_buffer_ = std::move(from);
    return;
  }
  ForEachAsName(node->GetNamesNode(), [&](const AsNameParts& parts) {
    const Text imported = ImportedName(parts.module);
    const bool has_as_name = !IsNone(parts.as_name);
    const Text name = has_as_name ? Keep(parts.as_name) : imported;
    AddKeptNameDefined(name);
    scratch_.assign(from).append(imported);
    AddStableTypeEquiv(name, Keep(scratch_));
    if (has_as_name) AddImportAsName(name);
  });
  from_buffer_ = std::move(from);
}

}  // namespace quillet
