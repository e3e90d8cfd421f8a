// The numbers of the node classes and the test "is a".
//
// Kinds are numbered in preorder of the class tree, so a class and its descendants are one range
// and the test is two comparisons.
#pragma once

#include <cstdint>

#include "foundations/text.h"

namespace quillet {

enum class NodeKind : uint8_t {
#define QUILLET_NODE(name, base) k##name,
#include "tree/node_kinds.def"
};

inline constexpr int kNodeKindCount = 0
#define QUILLET_NODE(name, base) +1
#include "tree/node_kinds.def"
    ;

#define QUILLET_NODE(name, base) struct name;
#include "tree/node_kinds.def"

// For each class its kind and the last kind of its range.
template <class T>
struct NodeKindRange;
#define QUILLET_NODE(name, base)                          \
  template <>                                             \
  struct NodeKindRange<name> {                            \
    static constexpr NodeKind kFirst = NodeKind::k##name; \
    static constexpr NodeKind kLast = NodeKind::k##name;  \
  };
#define QUILLET_NODE_BASE(name, base, last)               \
  template <>                                             \
  struct NodeKindRange<name> {                            \
    static constexpr NodeKind kFirst = NodeKind::k##name; \
    static constexpr NodeKind kLast = NodeKind::k##last;  \
  };
#include "tree/node_kinds.def"

template <class T>
constexpr bool IsKind(NodeKind kind) {
  return kind >= NodeKindRange<T>::kFirst && kind <= NodeKindRange<T>::kLast;
}

// The class name, such as "CAtom".
const char* NameOfNodeKind(NodeKind kind);
// The kind of the base class; CNode's own is CNode.
NodeKind BaseOfNodeKind(NodeKind kind);

}  // namespace quillet
