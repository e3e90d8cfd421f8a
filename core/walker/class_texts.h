// The classes that isinstance and except clauses name.
#pragma once

#include "vocabulary/symbolinfo.h"
#include "walker/walker.h"

namespace quillet {

inline Text CNodeWalker::InstanceNameForClass(Text cls_name) {
  scratch_.clear();
  AppendInstanceNameForClass(cls_name, scratch_);
  return scratch_;
}

template <class Function>
void CNodeWalker::ForEachClassText(CNode* node, Function&& function) {
  if (const Text cls = fToText.TextForNode(node, {.dotted_name_only = true}); !IsNone(cls)) return function(cls);
  NodeList elements;
  if (!ExpandSeqLiteral(node, elements)) return;
  for (CNode* element : elements) {
    // Elements that are no dotted name are skipped.
    if (const Text cls = fToText.TextForNode(element, {.dotted_name_only = true}); !IsNone(cls)) function(cls);
  }
}

}  // namespace quillet
