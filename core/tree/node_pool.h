// The memory of nodes: slabs of nodes, arrays of children, class records and the texts that a host
// gave to nodes.
//
// All of it is freed when the pool goes, and not before; a factory holds a reference, and so does
// every wrapper of a node that a host keeps. Child arrays of up to kKeptCapacity entries stay with
// their node across reuse, longer ones go back when the node is discarded, so that one huge
// statement does not stay in memory.
//
// Two kinds of nodes leave recycling: the part of a tree below the depth limit of a discard, and
// nodes without a record. A host that looks at nodes must find the former untouched and never see
// the latter again as another class, so both wait here until no wrapper is left.
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <deque>
#include <memory>
#include <new>
#include <string>
#include <unordered_set>
#include <vector>

#include "foundations/ref.h"
#include "tree/node.h"

namespace quillet {

// Hash of texts that lets a set of strings be asked with a view.
struct TextHash {
  using is_transparent = void;
  size_t operator()(Text text) const { return std::hash<Text>()(text); }
};
using TextSet = std::unordered_set<std::string, TextHash, std::equal_to<>>;

class NodePool : public RefCounted {
 public:
  static constexpr uint32_t kKeptCapacity = 16;

  NodePool() = default;
  ~NodePool() override;

  // A new record, owned by this pool; the name is copied.
  CNodeClassInfo* NewClassInfo(NodeKind kind, int32_t node_type, Text name);

  // A node object of a class, with `cls_info` (null: without a record): memory given back by
  // Reclaim or new memory.
  CNode* Construct(NodeKind kind, CNodeClassInfo* cls_info);

  // Room for `count` children (and has_children set); entries that were there stay, new ones are
  // the caller's to fill.
  CNode** ResizeChildren(CNode* node, uint32_t count) {
    if (count > node->child_capacity) [[unlikely]]
      GrowChildren(node, count);
    node->child_count = count;
    node->has_children = true;
    return node->children;
  }
  // Drops the list of children (not the children); has_children is false afterwards.
  void ClearChildren(CNode* node) {
    node->child_count = 0;
    node->has_children = false;
    if (node->child_capacity > kKeptCapacity) [[unlikely]]
      FreeChildren(node);
  }
  // Replaces the context; a host's object that was the old one is released.
  void SetContext(CNode* node, Context context) {
    const Context old = node->fContext;
    node->fContext = context;
    ReleaseContext(old);  // last, since it may run code of the host's that looks at the node
  }
  void ReleaseContext(Context context) {
    if (context.IsForeign() && release_foreign != nullptr) [[unlikely]]
      release_foreign(context.value);
  }
  // Text and context of a discarded node.
  void WipeLeafFields(CNode* node) {
    node->text = nullptr;
    node->text_length = 0;
    node->code = tok::REMOVED;
    SetContext(node, Context::None());
  }

  // Gives the memory of a whole tree back to the pool, without recursion and whatever its records:
  // for trees that leave recycling (a failed parse). Nodes with a record go to its free list, others
  // are kept for Construct. While the host may see nodes of this pool (see host_views) the tree is
  // left as it is and reclaimed when it no longer may. Null is nothing.
  void Reclaim(CNode* node);
  // The same for a tree whose nodes are to keep their fields for now: it is reclaimed when another
  // tree is discarded.
  void Abandon(CNode* node);
  // A discarded, wiped node without a record: kept for Construct as soon as no wrapper may show it.
  // A node that is kept already is not kept twice.
  void KeepForReuse(CNode* node);

  // Takes up what waits, provided that no host view is left. FinishedWithNode does it for each
  // tree, in one test; a host calls HostViewsDropped when it lets go of its last wrapper while no
  // other thread uses the pool.
  void ReclaimWaiting() {
    if (something_waits_ && host_views == 0) [[unlikely]]
      ReclaimAllWaiting();
  }
  void HostViewsDropped() { ReclaimWaiting(); }

  // ---- strays: trees that nobody gives back ----
  // Counts a tree that may have become one: a host let go of a wrapper of a node in use, or a tree waits
  // for wrappers to go.
  void CountStray() { ++strays_; }
  // Whether there may be so many that a search pays.
  bool MayHoldStrays() const { return strays_ >= stray_limit_; }
  // Takes back all nodes in use that are not marked with is_reached, and those that wait. To be called
  // while nothing works with nodes of the pool. `reached` is the number of nodes that were marked, in all pools,
  // which is what a search costs.
  void TakeBackStrays(size_t reached);

  // A stable copy of a text, one for equal texts: for nodes that a host makes.
  Text Intern(Text text);

  // Number of wrappers through which the host sees nodes of this pool; kept by the bindings.
  std::atomic<int64_t> host_views{0};

  // Called for a node's context that is an object of the host's when the node lets go of it.
  void (*release_foreign)(int32_t number) = nullptr;

  // Tells whether an operation is under way, in whose middle a host may run. An array of children that a
  // host's change or discard puts out of use then stays as it is until the operation is over. Null: there
  // is no host.
  static inline bool (*is_core_waiting)() = nullptr;
  // Frees those arrays. To be called while nothing works with nodes of the pool.
  void FreeRetiredArrays() {
    if (!retired_arrays_.empty()) [[unlikely]]
      FreeAllRetiredArrays();
  }

  size_t node_count() const { return node_count_; }

 private:
  struct DeleteAligned {
    void operator()(std::byte* bytes) const { ::operator delete[](bytes, std::align_val_t{alignof(CNode)}); }
  };
  struct Slab {
    std::unique_ptr<std::byte[], DeleteAligned> bytes;
    size_t used;  // in nodes
    size_t size;
    CNode* node(size_t index) const { return std::launder(reinterpret_cast<CNode*>(bytes.get()) + index); }
  };

  void GrowChildren(CNode* node, uint32_t count);
  void FreeChildren(CNode* node);
  CNode** NewChildArray(uint32_t capacity);
  void ReclaimNow(CNode* root);
  void ReclaimAllWaiting();
  void FreeArray(CNode** array, uint32_t capacity);
  void FreeAllRetiredArrays();
  void MarkNodesAtRest();
  void TakeBack(CNode* node);
  std::byte* NewNodeStorage();

  std::vector<Slab> slabs_;
  size_t node_count_ = 0;   // node objects that stand in slabs
  CNode* spare_ = nullptr;  // record-less nodes given back, chained by fNextFree

  std::vector<std::unique_ptr<CNode*[]>> child_blocks_;
  size_t child_block_used_ = 0;                      // entries handed out of the newest block
  std::array<std::vector<CNode**>, 4> free_arrays_;  // outgrown arrays of 2, 4, 8 and 16 entries

  struct RetiredArray {
    CNode** array;
    uint32_t capacity;
  };
  std::vector<RetiredArray> retired_arrays_;  // see is_core_waiting

  static constexpr size_t kFewStrays = 64;
  size_t strays_ = 0;
  size_t stray_limit_ = kFewStrays;

  bool something_waits_ = false;
  std::vector<CNode*> abandoned_;  // roots of trees to reclaim
  std::vector<CNode*> unseen_;     // wiped record-less nodes to keep for reuse
  std::vector<CNode*> pending_;    // work list of ReclaimNow

  std::deque<CNodeClassInfo> class_infos_;
  TextSet texts_;
};

}  // namespace quillet
