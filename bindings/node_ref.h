// The objects through which the host sees nodes and their records.
//
// A wrapper is a small handle: the node, the pool that owns its memory and the source that holds its
// texts. There is one live wrapper a node, so `is` tells nodes apart and a node that was discarded
// and handed out again is the same object. The pool is told how many wrappers exist, and leaves
// memory that they may show alone.
//
// A node's list of children is made when the host reads it, and is the host's from then on: what it
// changes in the list reaches the node on entry to the next operation that may read the node, and a
// list whose node was changed by the core meanwhile is let go. A list that nobody else holds goes,
// too. An operation brings the lists below the node it is given up to date and no others, so that a
// host may hold all lists of a huge tree while it walks it.
//
// A host may join nodes of several pools to one tree. A pool then keeps the pools of its nodes'
// children for as long as a wrapper may reach it, through any number of pools.
//
// A wrapper held past its tree's discard may show other content; it never shows freed memory. Texts
// of a pool's nodes stand in sources that come and go, so while wrappers exist the pool pins each
// source that its nodes may refer to (PinSource).
#pragma once

#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "lines/source_text.h"
#include "tree/arg_info.h"
#include "tree/factory.h"
#include "tree/node_pool.h"
#include "tree/nodes.h"

namespace quillet::host {

class NodeRef {
 public:
  NodeRef() = default;
  NodeRef(const NodeRef&) = delete;
  NodeRef& operator=(const NodeRef&) = delete;
  ~NodeRef();

  // Makes this the wrapper of a node.
  void Attach(PyObject* self, CNode* node, Ref<SourceText> source);
  // Says that the node came from NewBareNode: it goes back there if the host lets go of it before
  // it has a place in a tree.
  void IsLoneBareNode() { is_lone_bare_ = true; }

  // The node; RuntimeError where it was given to another class since.
  CNode* node() const {
    if (node_ == nullptr || node_->kind != kind_) [[unlikely]]
      ThrowStale();
    return node_;
  }
  const Ref<SourceText>& source() const { return source_; }

  // ---- fChildren as the host has it ----
  nb::object GetChildren();
  void SetChildren(nb::handle list);  // a list or None
  // The list of this node's children that the host holds, a null object where it holds none. To be
  // read in place of the node's children, which may lag behind.
  nb::object HeldChildren();
  // Takes over what the host changed in its list of this node's children.
  void Synchronise();
  // The list that this wrapper shows to the collector, null without one; and its end.
  PyObject* OwnList() const;
  void DropList();

 private:
  friend class NodeRegistry;
  [[noreturn]] static void ThrowStale();

  CNode* node_ = nullptr;
  NodeKind kind_ = NodeKind::kCNode;
  PyObject* self_ = nullptr;
  Ref<NodePool> pool_;
  Ref<SourceText> source_;
  bool is_lone_bare_ = false;  // made by the host, in no tree yet
};

// What makes a wrapper an object of the collector's: a host's node may hold the list that it stands in.
extern const PyType_Slot kNodeSlots[];

// The C++ type bound for a node class: the same handle, in the class tree of the nodes.
template <class T>
struct NodeHandle;
#define QUILLET_NODE(name, base) \
  template <>                    \
  struct NodeHandle<name> : std::conditional_t<std::is_same_v<name, base>, NodeRef, NodeHandle<base>> {};
#include "tree/node_kinds.def"

// ---- nodes to the host ----

// The wrapper of a node, whose texts stand in `source`; None for null.
nb::object Wrap(CNode* node, const Ref<SourceText>& source);
// The same for a node that a free list leads to, which need not be in a tree or in use.
nb::object WrapNeighbour(CNode* node);
nb::object WrapList(std::span<CNode* const> nodes, const Ref<SourceText>& source);
nb::object WrapClassInfo(CNodeClassInfo* info);
// The record of a CNodeClassInfo, null for None; TypeError for anything else.
CNodeClassInfo* InfoOrNull(nb::handle object);
nb::object WrapArg(const CArgInfo& arg, const Ref<SourceText>& source);
nb::object WrapUsedArgs(const UsedArgList& args, const Ref<SourceText>& source);
// Nested lists stay nested; RecursionError past the host's limit.
nb::object WrapArgList(const ArgList& args, const Ref<SourceText>& source);
nb::object WrapAsName(const CAsName& name);

// The host's class that serves a record, where that is a class of its own; that of the kind otherwise.
nb::handle ClassOfInfo(CNodeClassInfo* info);

// The Python class of a kind, and the kind of a class; TypeError for what is no node class.
nb::handle ClassOfKind(NodeKind kind);
NodeKind KindOfClass(nb::handle cls);
bool IsNodeClass(nb::handle cls);

// ---- nodes from the host ----

// The handle of a wrapper; TypeError "Expected CNode, got ..." (or the class wanted) for anything else.
NodeRef& CheckedRef(nb::handle object, NodeKind wanted = NodeKind::kCNode);
// The same for an operation that reads nodes. Brings the lists of children below the
// node up to date, since the operation that follows may read the whole tree.
NodeRef& RefOf(nb::handle object, NodeKind wanted = NodeKind::kCNode);
// The same with None for null.
NodeRef* RefOrNull(nb::handle object, NodeKind wanted = NodeKind::kCNode);
inline CNode* NodeOrNull(nb::handle object, NodeKind wanted = NodeKind::kCNode) {
  NodeRef* ref = RefOrNull(object, wanted);
  return ref == nullptr ? nullptr : ref->node();
}
inline Ref<SourceText> SourceOf(const NodeRef* ref) { return ref == nullptr ? Ref<SourceText>() : ref->source(); }

// A list of CNode (None where `none` allows it) as nodes.
std::vector<CNode*> NodesOf(nb::handle list, NodeKind wanted = NodeKind::kCNode, bool none = false);
CArgInfo ArgOf(nb::handle object);
UsedArgList UsedArgsOf(nb::handle list);
ArgList ArgListOf(nb::handle list);

// At the start of an operation that may put arrays of children of the pool's nodes out of use: those that earlier
// operations did can go.
void FreeRetiredArrays(NodePool& pool);
// At the start of an operation that makes nodes of the pool from a source.
void PinSource(NodePool& pool, SourceText* source);

// Gives the texts of all nodes that wrappers of the pool may reach to the pool: for texts that are
// about to go.
void RehomeTexts(NodePool& pool);

// The host's class of a node: that of its wrapper where there is one.
nb::handle ClassOfNode(CNode* node);

// A node that the host makes without a record.
CNode* NewBareNode(NodeKind kind);

// A pool for records that the host makes: it may bind a record to a class of its own.
class HostPool : public NodePool {
 public:
  std::unordered_map<CNodeClassInfo*, nb::object> classes;
};

// ---- factories ----

// A CNodeFactory of the host: made by it, or a parser's own.
struct FactoryObject {
  std::shared_ptr<CNodeFactory> factory;
  nb::object keywords;        // the host's dict
  nb::object class_infos;     // list, made when read
  nb::object op_text2number;  // dict
};
nb::object NewFactoryObject(std::shared_ptr<CNodeFactory> factory, nb::object keywords);
CNode* RecursiveConvert(CNodeFactory& factory, nb::handle raw_node);
// ConvertSingleNode with the host's values.
nb::object ConvertSingleNode(CNodeFactory& factory, nb::handle nodetype, nb::handle text, nb::handle context,
                             nb::handle children);

}  // namespace quillet::host
