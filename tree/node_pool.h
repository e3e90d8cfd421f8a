// The memory of nodes: slabs of nodes, arrays of children, class records and the texts that a host
// gave to nodes.
//
// All of it is freed when the pool goes, and not before; a factory holds a reference, and so does
// every wrapper of a node that a host keeps. Child arrays of up to kKeptCapacity entries stay with
// their node across reuse, longer ones go back when the node is discarded, so that one huge
// statement does not stay in memory.
#pragma once

#include <deque>
#include <memory>
#include <string>
#include <unordered_set>
#include <vector>

#include "foundations/ref.h"
#include "tree/node.h"

namespace quillet {

class NodePool : public RefCounted {
 public:
  static constexpr uint32_t kKeptCapacity = 16;

  NodePool() = default;
  ~NodePool() override;

  // A new record, owned by this pool.
  CNodeClassInfo* NewClassInfo(NodeKind kind, int32_t node_type, Text name);

  // A node object of a class, without a record: memory given back by Reclaim or new memory.
  CNode* Construct(NodeKind kind, CNodeClassInfo* cls_info);

  // Room for `count` children (and has_children set); the entries are the caller's to fill.
  CNode** ResizeChildren(CNode* node, uint32_t count) {
    if (count > node->child_capacity) [[unlikely]] GrowChildren(node, count);
    node->child_count = count;
    node->has_children = true;
    return node->children;
  }
  // Drops the list of children (not the children); has_children is false afterwards.
  void ClearChildren(CNode* node) {
    node->child_count = 0;
    node->has_children = false;
    if (node->child_capacity > kKeptCapacity) [[unlikely]] FreeChildren(node);
  }

  // Gives the memory of a whole tree back to the pool, without recursion and whatever its records:
  // for trees that leave recycling (a failed parse, the part of a tree below the depth limit).
  // Nodes with a record go to its free list, others are kept for Construct. A no-op while the host
  // may see nodes of this pool (see host_views), which then go with the pool.
  void Reclaim(CNode* node);

  // Nodes that were given back and have no record: kept for Construct. The node must be wiped.
  void KeepForReuse(CNode* node);

  // A stable copy of a text, one for equal texts: for nodes that a host makes.
  Text Intern(Text text);

  // Number of wrappers through which the host sees nodes of this pool; kept by the bindings.
  int64_t host_views = 0;

  // Called for a node's context that is an object of the host's when the node lets go of it.
  void (*release_foreign)(int32_t number) = nullptr;

  size_t node_count() const { return node_count_; }

 private:
  void GrowChildren(CNode* node, uint32_t count);
  void FreeChildren(CNode* node);

  std::vector<std::unique_ptr<CNode[]>> slabs_;
  size_t slab_used_ = 0;      // nodes handed out of the newest slab
  size_t slab_size_ = 0;
  size_t node_count_ = 0;     // nodes ever constructed
  CNode* spare_ = nullptr;    // record-less nodes given back, chained by fNextFree
  std::deque<CNodeClassInfo> class_infos_;
  std::unordered_set<std::string> texts_;
};

}  // namespace quillet
