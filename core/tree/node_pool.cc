// Where nodes and their arrays of children live, and how trees that leave recycling are taken back.
//
// Nodes stand in slabs that are freed with the pool alone, so a pointer to a node is never dangling
// while the pool lives. Arrays of children come in sizes 2, 4, 8 and 16 from shared blocks and stay
// with their node; a longer one is an allocation of its own. The trap is the host: as long as it
// holds a wrapper, nothing that it may still look at can change class or content behind its back.
#include "tree/node_pool.h"

#include <algorithm>
#include <bit>

#include "tree/nodes.h"

namespace quillet {
namespace {

constexpr size_t kFirstSlabNodes = 64;
constexpr size_t kLargestSlabNodes = 4096;
constexpr size_t kChildBlockEntries = 1024;
// A work list that a huge tree has grown beyond this goes back to the memory manager.
constexpr size_t kKeptPending = 4096;

CNode* ConstructIn(std::byte* storage, NodeKind kind) {
  switch (kind) {
#define QUILLET_NODE(name, base) \
  case NodeKind::k##name:        \
    return ::new (storage) name;
#include "tree/node_kinds.def"
  }
  return nullptr;
}

// Of the sizes of small arrays: 0 for 2 entries, 1 for 4, 2 for 8, 3 for 16.
size_t SizeClass(uint32_t capacity) { return static_cast<size_t>(std::bit_width(capacity)) - 2; }

}  // namespace

NodePool::~NodePool() {
  for (const Slab& slab : slabs_) {
    for (size_t i = 0; i < slab.used; ++i) {
      CNode* node = slab.node(i);
      ReleaseContext(node->fContext);
      if (node->child_capacity > kKeptCapacity) delete[] node->children;
    }
  }
  FreeRetiredArrays();
}

CNodeClassInfo* NodePool::NewClassInfo(NodeKind kind, int32_t node_type, Text name) {
  return &class_infos_.emplace_back(CNodeClassInfo{kind, node_type, Intern(name), nullptr, this});
}

std::byte* NodePool::NewNodeStorage() {
  if (slabs_.empty() || slabs_.back().used == slabs_.back().size) {
    const size_t size = slabs_.empty() ? kFirstSlabNodes : std::min(slabs_.back().size * 2, kLargestSlabNodes);
    auto* bytes = static_cast<std::byte*>(::operator new[](size * sizeof(CNode), std::align_val_t{alignof(CNode)}));
    slabs_.push_back({std::unique_ptr<std::byte[], DeleteAligned>(bytes), 0, size});
  }
  Slab& slab = slabs_.back();
  ++node_count_;
  return slab.bytes.get() + slab.used++ * sizeof(CNode);
}

CNode* NodePool::Construct(NodeKind kind, CNodeClassInfo* cls_info) {
  CNode** children = nullptr;
  uint32_t child_capacity = 0;
  std::byte* storage;
  if (spare_ != nullptr) {
    children = spare_->children;
    child_capacity = spare_->child_capacity;
    storage = reinterpret_cast<std::byte*>(std::exchange(spare_, spare_->fNextFree));
  } else {
    storage = NewNodeStorage();
  }
  CNode* node = ConstructIn(storage, kind);
  node->kind = kind;
  node->fClsInfo = cls_info;
  node->pool = this;
  node->children = children;
  node->child_capacity = child_capacity;
  return node;
}

CNode** NodePool::NewChildArray(uint32_t capacity) {
  if (capacity > kKeptCapacity) return new CNode*[capacity];
  std::vector<CNode**>& outgrown = free_arrays_[SizeClass(capacity)];
  if (!outgrown.empty()) {
    CNode** array = outgrown.back();
    outgrown.pop_back();
    return array;
  }
  if (child_blocks_.empty() || child_block_used_ + capacity > kChildBlockEntries) {
    child_blocks_.push_back(std::make_unique<CNode*[]>(kChildBlockEntries));
    child_block_used_ = 0;
  }
  CNode** array = child_blocks_.back().get() + child_block_used_;
  child_block_used_ += capacity;
  return array;
}

void NodePool::GrowChildren(CNode* node, uint32_t count) {
  const uint32_t capacity = count > kKeptCapacity ? count : std::max(2u, std::bit_ceil(count));
  CNode** grown = NewChildArray(capacity);
  std::copy_n(node->children, node->child_count, grown);
  FreeChildren(node);
  node->children = grown;
  node->child_capacity = capacity;
}

void NodePool::FreeArray(CNode** array, uint32_t capacity) {
  if (capacity > kKeptCapacity) {
    delete[] array;
  } else if (capacity != 0) {
    free_arrays_[SizeClass(capacity)].push_back(array);
  }
}

void NodePool::FreeChildren(CNode* node) {
  if (is_core_waiting != nullptr && is_core_waiting()) {
    if (node->child_capacity != 0) retired_arrays_.push_back({node->children, node->child_capacity});
    something_waits_ = true;
  } else {
    FreeRetiredArrays();
    FreeArray(node->children, node->child_capacity);
  }
  node->children = nullptr;
  node->child_capacity = 0;
}

void NodePool::KeepForReuse(CNode* node) {
  if (node->given_back) return;
  node->given_back = true;
  if (host_views != 0) {
    unseen_.push_back(node);
    something_waits_ = true;
    return;
  }
  node->fNextFree = spare_;
  spare_ = node;
}

void NodePool::Reclaim(CNode* node) {
  if (node == nullptr) return;
  if (host_views != 0) {
    Abandon(node);
  } else {
    ReclaimNow(node);
  }
}

void NodePool::Abandon(CNode* node) {
  abandoned_.push_back(node);
  CountStray();
  something_waits_ = true;
}

void NodePool::ReclaimNow(CNode* root) {
  pending_.push_back(root);
  while (!pending_.empty()) {
    CNode* node = pending_.back();
    pending_.pop_back();
    for (CNode* child : node->fChildren()) {
      if (child != nullptr) pending_.push_back(child);
    }
    // A host may have joined nodes of several pools to one tree.
    node->pool->ClearChildren(node);
    node->pool->WipeLeafFields(node);
    if (CNodeClassInfo* cls_info = node->fClsInfo) {
      node->fNextFree = cls_info->fFirstFree;
      cls_info->fFirstFree = node;
    } else {
      node->pool->KeepForReuse(node);
    }
  }
  if (pending_.capacity() > kKeptPending) std::vector<CNode*>().swap(pending_);
}

void NodePool::FreeAllRetiredArrays() {
  for (const auto& [array, capacity] : retired_arrays_) FreeArray(array, capacity);
  retired_arrays_.clear();
}

void NodePool::ReclaimAllWaiting() {
  something_waits_ = false;
  if (is_core_waiting == nullptr || !is_core_waiting()) {
    FreeRetiredArrays();
  } else {
    something_waits_ = !retired_arrays_.empty();
  }
  for (CNode* node : std::exchange(unseen_, {})) {
    node->given_back = false;
    KeepForReuse(node);
  }
  for (CNode* root : std::exchange(abandoned_, {})) ReclaimNow(root);
}

// Marks the nodes that are in no tree: on a free list, which a second discard may have closed to a ring, or kept for
// another use.
void NodePool::MarkNodesAtRest() {
  const auto mark_chain = [](CNode* node) {
    for (; node != nullptr && !node->is_at_rest; node = node->fNextFree) node->is_at_rest = true;
  };
  for (const CNodeClassInfo& info : class_infos_) mark_chain(info.fFirstFree);
  mark_chain(spare_);
  for (CNode* node : unseen_) node->is_at_rest = true;
}

// Puts a node that is in nobody's hands where it is found when one is needed.
void NodePool::TakeBack(CNode* node) {
  ClearChildren(node);
  WipeLeafFields(node);
  if (CNodeClassInfo* cls_info = node->fClsInfo) {
    node->fNextFree = cls_info->fFirstFree;
    cls_info->fFirstFree = node;
  } else {
    node->given_back = true;
    node->fNextFree = std::exchange(spare_, node);
  }
}

void NodePool::TakeBackStrays(size_t reached) {
  MarkNodesAtRest();
  std::erase_if(abandoned_, [](const CNode* root) { return !root->is_reached; });
  std::erase_if(unseen_, [this](CNode* node) {
    if (!node->is_reached) node->fNextFree = std::exchange(spare_, node);
    return !node->is_reached;
  });
  for (const Slab& slab : slabs_) {
    for (size_t i = 0; i < slab.used; ++i) {
      CNode* node = slab.node(i);
      if (!node->is_at_rest && !node->is_reached) TakeBack(node);
      node->is_at_rest = false;
    }
  }
  strays_ = 0;
  stray_limit_ = std::max(kFewStrays, reached / 4);
}

Text NodePool::Intern(Text text) {
  if (IsNone(text)) return kNoText;
  auto found = texts_.find(text);
  if (found == texts_.end()) found = texts_.emplace(text).first;
  return *found;
}

}  // namespace quillet
