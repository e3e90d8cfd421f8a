// CNode, the node of every syntax tree, and CNodeClassInfo, the record of its parser state.
//
// A node is plain data: five fields to the host (fChildren, fText, fContext, fClsInfo, fNextFree)
// and, beside the text, the token code that lets an accessor compare a byte where it asks for a
// fixed token. Subclasses add accessors only, no field and no virtual function; the kind byte says
// which class was constructed in the storage, and isa/cast/dyn_cast go by it.
//
// Memory belongs to a NodePool. A node is handed out by NewNode and given back once, by
// FinishedWithNode, to the free list of its class record; after that neither it nor anything that
// refers to it may be used.
#pragma once

#include <cassert>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <type_traits>

#include "foundations/errors.h"
#include "foundations/text.h"
#include "tokens/token.h"
#include "tree/node_kind.h"

namespace quillet {

class NodePool;

// Per state of the parser: which class serves it, and the free list of its discarded nodes.
struct CNodeClassInfo {
  NodeKind kind = NodeKind::kCNode;
  int32_t fNodeType = 0;  // state number: a token type or a grammar symbol
  Text fName = kNoText;   // symbol name, token name or "KEYWORD"; may be none
  CNode* fFirstFree = nullptr;
  NodePool* pool = nullptr;  // owns the nodes of this record
};

// The place of the `index`th of every second child, from `offset` on. An index beyond any list
// stays beyond.
constexpr int64_t EverySecond(int64_t index, int64_t offset) {
  constexpr int64_t kBeyond = int64_t{1} << 32;
  return (index < -kBeyond ? -kBeyond : index > kBeyond ? kBeyond : index) * 2 + offset;
}

// The failures that reading a tree of the wrong shape ends in, out of line to keep accessors small.
[[noreturn]] void ThrowNoAttribute(const char* field);                  // AttributeError: a child that is absent
[[noreturn]] void ThrowNoSuchChild(const CNode* node);                  // IndexError, or TypeError without children
[[noreturn]] void ThrowWrongClass(NodeKind wanted, const CNode* node);  // TypeError

[[noreturn]] void ThrowTooDeep();  // RecursionError

// Counts the steps of a descent from child to child that takes no machine stack. It ends for any tree
// but one that a host closed to a ring, and that ends in RecursionError.
class DescentBound {
 public:
  void Step() {
    if (++steps_ > kMost) [[unlikely]]
      ThrowTooDeep();
  }

 private:
  static constexpr uint32_t kMost = uint32_t{1} << 22;  // brackets of a source of 8 MiB, and none else
  uint32_t steps_ = 0;
};

struct alignas(64) CNode {
  CNodeClassInfo* fClsInfo = nullptr;
  CNode* fNextFree = nullptr;
  const char* text = nullptr;  // null: no text
  CNode** children = nullptr;  // storage kept across reuse; see has_children
  uint32_t text_length = 0;
  uint32_t child_count = 0;
  uint32_t child_capacity = 0;
  Context fContext;
  NodeKind kind = NodeKind::kCNode;
  TokenCode code = tok::REMOVED;  // of the text; REMOVED where there is none
  bool has_children = false;      // false: the host sees None in place of the list
  bool given_back : 1 = false;    // the pool keeps this record-less node for another use
  bool is_reached : 1 = false;    // marks of a search for stray nodes, see NodePool::TakeBackStrays
  bool is_at_rest : 1 = false;
  NodePool* pool = nullptr;  // owns the memory; set once

  // ---- fields as the host names them ----
  Text fText() const { return {text, text_length}; }
  std::span<CNode* const> fChildren() const { return {children, child_count}; }

  // ---- the virtual operations of the contract ----
  int64_t GetChildCount() const { return child_count; }
  // Text of the child at `index`; none for an interior child and past the end. A negative index
  // counts from the end; IndexError before the start; AttributeError for an absent child.
  Text GetChildText(int64_t index) const {
    if (static_cast<uint64_t>(index) < child_count) [[likely]]
      return TextOf(children[index]);
    return index < 0 && has_children ? TextOf(ChildFromEnd(index)) : kNoText;
  }
  // The child at `index`, null past the end; negative as above.
  CNode* GetChild(int64_t index) const {
    if (static_cast<uint64_t>(index) < child_count) [[likely]]
      return children[index];
    return index < 0 && has_children ? ChildFromEnd(index) : nullptr;
  }
  // Symbol or token name of the record; the class name without a record.
  Text GetStateName() const;
  bool DoesChildTextMatch(Text wanted) const;

  // ---- inline forms for the core ----
  uint32_t ChildCount() const { return child_count; }
  // The child at `index`, or null where there is none.
  CNode* Child(uint32_t index) const { return index < child_count ? children[index] : nullptr; }
  // True where there is such a child and its token has this code. Codes of words and operators
  // stand for one text each, but for NOTEQUAL ("!=", "<>") and RARROW ("->", "@="). AttributeError
  // for an absent child.
  bool ChildIs(uint32_t index, TokenCode wanted) const {
    return index < child_count && CodeOf(children[index]) == wanted;
  }
  bool HasChildWithCode(TokenCode wanted) const {
    for (uint32_t i = 0; i < child_count; ++i) {
      if (CodeOf(children[i]) == wanted) return true;
    }
    return false;
  }
  // The child at `index`, negative from the end; IndexError where it is missing, TypeError where
  // there are no children.
  CNode* ChildAt(int64_t index) const {
    if (static_cast<uint64_t>(index) < child_count) [[likely]]
      return children[index];
    return ChildFromEnd(index);
  }
  // Whether the token of the child at `index` has this code, failing as ChildAt does.
  bool ChildAtIs(int64_t index, TokenCode wanted) const { return CodeOf(ChildAt(index)) == wanted; }
  CNode* LastChild() const { return child_count ? children[child_count - 1] : nullptr; }
  bool IsLeaf() const { return text != nullptr; }

 private:
  static Text TextOf(const CNode* child) {
    if (child == nullptr) [[unlikely]]
      ThrowNoAttribute("fText");
    return child->fText();
  }
  static TokenCode CodeOf(const CNode* child) {
    if (child == nullptr) [[unlikely]]
      ThrowNoAttribute("fText");
    return child->code;
  }
  // A negative index within the list; fails for any other.
  CNode* ChildFromEnd(int64_t index) const {
    if (index >= 0 || index < -static_cast<int64_t>(child_count)) [[unlikely]]
      ThrowNoSuchChild(this);
    return children[child_count + index];
  }
};

// A class and its range of kinds; null counts as "is not".
template <class T>
bool isa(const CNode* node) {
  return node != nullptr && IsKind<T>(node->kind);
}
template <class T>
T* cast(CNode* node) {
  assert(isa<T>(node));
  return static_cast<T*>(node);
}
template <class T>
const T* cast(const CNode* node) {
  assert(isa<T>(node));
  return static_cast<const T*>(node);
}
template <class T>
T* dyn_cast(CNode* node) {
  return isa<T>(node) ? static_cast<T*>(node) : nullptr;
}
template <class T>
const T* dyn_cast(const CNode* node) {
  return isa<T>(node) ? static_cast<const T*>(node) : nullptr;
}

static_assert(sizeof(CNode) == 64, "a node is one cache line");
static_assert(std::is_trivially_destructible_v<CNode>, "pools drop nodes without a call");

// The node itself, which must be a T or null: TypeError "Expected CExpression, got CNode".
template <class T>
T* Expect(CNode* node) {
  if (node != nullptr && !IsKind<T>(node->kind)) [[unlikely]]
    ThrowWrongClass(NodeKindRange<T>::kFirst, node);
  return static_cast<T*>(node);
}

// repr() of a class to the host: "<class 'quillet.tarvex.CAtom'>".
std::string ReprOfKind(NodeKind kind);
// repr() of a node to the host: "<class 'quillet.tarvex.CAtom'>: atom".
std::string ReprOfNode(const CNode* node);
// repr() of a list of nodes: each as ReprOfNode has it, "None" for an absent one.
std::string ReprOfNodes(std::span<CNode* const> nodes);

}  // namespace quillet
