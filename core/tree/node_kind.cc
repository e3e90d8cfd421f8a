// Names and bases of the node classes, straight from the table that declares them.
#include "tree/node_kind.h"

#include <iterator>

namespace quillet {
namespace {

struct KindRow {
  const char* name;
  NodeKind base;
};

constexpr KindRow kKindRows[] = {
#define QUILLET_NODE(name, base) {#name, NodeKind::k##base},
#include "tree/node_kinds.def"
};
static_assert(std::size(kKindRows) == kNodeKindCount);

// Preorder: a class stands behind its base and inside its base's range, or "is a" would be wrong.
constexpr bool IsPreorder() {
  for (int kind = 1; kind < kNodeKindCount; ++kind) {
    if (static_cast<int>(kKindRows[kind].base) >= kind) return false;
  }
  return true;
}
static_assert(IsPreorder());
#define QUILLET_NODE(name, base) \
  static_assert(NodeKindRange<base>::kFirst <= NodeKind::k##name && NodeKind::k##name <= NodeKindRange<base>::kLast);
#include "tree/node_kinds.def"

}  // namespace

const char* NameOfNodeKind(NodeKind kind) { return kKindRows[static_cast<int>(kind)].name; }

NodeKind BaseOfNodeKind(NodeKind kind) { return kKindRows[static_cast<int>(kind)].base; }

}  // namespace quillet
