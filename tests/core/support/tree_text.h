// Trees as short strings, for tests: a leaf is its text, an interior node its state (or class, for
// the nodes of hand-written parsers) and its children in brackets.
#pragma once

#include <string>

#include "tree/nodes.h"

namespace quillet::testing {

inline std::string ShowTree(const CNode* node) {
  if (node == nullptr) return "null";
  if (node->IsLeaf()) return std::string(node->fText() == "\n" ? Text("NEWLINE") : node->fText());
  std::string shown(node->GetStateName());
  shown += '(';
  bool is_first = true;
  for (const CNode* child : node->fChildren()) {
    if (!is_first) shown += ' ';
    is_first = false;
    shown += ShowTree(child);
  }
  return shown + ')';
}

// The contexts of the leaves from left to right, "3" for a token index and "1:4" for a position.
inline std::string ShowContexts(const CNode* node) {
  if (node->IsLeaf()) {
    const Context context = node->fContext;
    if (context.IsPosition())
      return std::to_string(context.position().line) + ":" + std::to_string(context.position().col);
    return context.IsIndex() ? std::to_string(context.value) : "-";
  }
  std::string shown;
  for (const CNode* child : node->fChildren()) shown += (shown.empty() ? "" : " ") + ShowContexts(child);
  return shown;
}

}  // namespace quillet::testing
