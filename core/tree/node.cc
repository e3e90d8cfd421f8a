// What a node says of itself and the failures of reading a tree of the wrong shape.
//
// The messages are those that the host's own objects give for the same mistake, so that a caller
// sees one kind of failure whichever side of the boundary made it.
#include "tree/node.h"

namespace quillet {

void ThrowNoAttribute(const char* field) {
  ThrowError(ErrorKind::kAttributeError, std::string("'NoneType' object has no attribute '") + field + "'");
}

void ThrowNoSuchChild(const CNode* node) {
  if (!node->has_children) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
  ThrowError(ErrorKind::kIndexError, "list index out of range");
}

void ThrowWrongClass(NodeKind wanted, const CNode* node) {
  ThrowError(ErrorKind::kTypeError,
             std::string("Expected ") + NameOfNodeKind(wanted) + ", got " + NameOfNodeKind(node->kind));
}

void ThrowTooDeep() { ThrowError(ErrorKind::kRecursionError, "maximum recursion depth exceeded"); }

Text CNode::GetStateName() const { return fClsInfo != nullptr ? fClsInfo->fName : Text(NameOfNodeKind(kind)); }

bool CNode::DoesChildTextMatch(Text wanted) const {
  for (const CNode* child : fChildren()) {
    const Text child_text = TextOf(child);
    if (!IsNone(child_text) && child_text == wanted) return true;
  }
  return false;
}

std::string ReprOfKind(NodeKind kind) { return std::string("<class 'quillet.tarvex.") + NameOfNodeKind(kind) + "'>"; }

std::string ReprOfNode(const CNode* node) {
  const Text state = node->GetStateName();
  std::string repr = ReprOfKind(node->kind) + ": ";
  repr += IsNone(state) ? Text("None") : state;
  return repr;
}

std::string ReprOfNodes(std::span<CNode* const> nodes) {
  std::string repr = "[";
  for (const CNode* node : nodes) {
    if (repr.size() > 1) repr += ", ";
    repr += node == nullptr ? std::string("None") : ReprOfNode(node);
  }
  repr += ']';
  return repr;
}

}  // namespace quillet
