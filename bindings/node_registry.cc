// The tables of wrappers and of the host's lists of children. See node_registry.h.
#include "bindings/node_registry.h"

#include <utility>

namespace quillet::host {

NodeRegistry& NodeRegistry::Get() {
  static auto* registry = new NodeRegistry;  // outlives the interpreter's last objects
  return *registry;
}

void NodeRegistry::Add(NodeRef* ref) {
  live_[ref->node_] = ref;
  ++ref->pool_->host_views;
}

void NodeRegistry::Forget(NodeRef* ref) {
  auto found = live_.find(ref->node_);
  if (found != live_.end() && found->second == ref) live_.erase(found);
}

void NodeRegistry::EndView(const Ref<NodePool>& pool) {
  if (--pool->host_views != 0) return;
  pool->HostViewsDropped();
  if (!kept_.empty()) LetGoOf(pool.get());
}

nb::object NodeRegistry::Reuse(NodeRef* ref, const Ref<SourceText>& source) {
  if (source && source.get() != ref->source_.get()) LetGo(std::exchange(ref->source_, source));
  return nb::borrow(ref->self_);
}

// ---- the host's lists of children ----

bool NodeRegistry::IsCurrent(const CNode* node, const HostList& kept) {
  const std::span<CNode* const> native = node->fChildren();
  return node->has_children &&
         std::equal(native.begin(), native.end(), kept.synchronised.begin(), kept.synchronised.end());
}

nb::object NodeRegistry::ListOf(CNode* node) {
  auto found = lists_.find(node);
  if (found == lists_.end()) return nb::object();
  if (IsCurrent(node, found->second)) return found->second.list;
  DropList(node);
  return nb::object();
}

PyObject* NodeRegistry::PeekList(const CNode* node) const {
  auto found = lists_.find(node);
  return found == lists_.end() ? nullptr : found->second.list.ptr();
}

void NodeRegistry::KeepList(CNode* node, const Ref<SourceText>& source, nb::object list, std::vector<CNode*> nodes) {
  held_items_ += nodes.size();
  lists_.emplace(node, HostList{std::move(list), std::move(nodes), node->pool, source, order_.size()});
  order_.push_back(node);
  ++node->pool->host_views;
  // From now on the wrapper may be part of a cycle.
  NodeRef* ref = Find(node);
  if (ref != nullptr && !PyObject_GC_IsTracked(ref->self_)) PyObject_GC_Track(ref->self_);
}

NodeRegistry::ListMap::node_type NodeRegistry::TakeList(const CNode* node) {
  auto taken = lists_.extract(node);
  if (taken) {
    HostList& kept = taken.mapped();
    held_items_ -= kept.synchronised.size();
    CNode* last = order_.back();
    order_[kept.place] = last;
    if (last != node) lists_.find(last)->second.place = kept.place;
    order_.pop_back();
  }
  return taken;
}

void NodeRegistry::DropList(const CNode* node) {
  auto dropped = TakeList(node);
  if (dropped) EndView(dropped.mapped().pool);
}

void NodeRegistry::Synchronise(CNode* node) {
  auto found = lists_.find(node);
  if (found == lists_.end()) return;
  HostList& kept = found->second;
  if (!IsCurrent(node, kept)) return DropList(node);
  PyObject* list = kept.list.ptr();
  const auto count = static_cast<size_t>(PyList_GET_SIZE(list));
  std::vector<CNode*> nodes(count);
  for (size_t i = 0; i < count; ++i) nodes[i] = Adopt(node, kept, PyList_GET_ITEM(list, static_cast<Py_ssize_t>(i)));
  if (nodes == kept.synchronised) return;
  std::copy(nodes.begin(), nodes.end(), node->pool->ResizeChildren(node, static_cast<uint32_t>(count)));
  held_items_ += count;
  held_items_ -= kept.synchronised.size();
  kept.synchronised = std::move(nodes);
}

void NodeRegistry::SynchroniseBelow(CNode* root) {
  if (lists_.empty()) [[likely]]
    return;
  DropSomeUnheld();
  if (SynchroniseTree(root, held_items_ + lists_.size())) return;
  // A list elsewhere that has a wrong item is nothing to this operation.
  bool all_went_well = true;
  for (CNode* node : std::vector<CNode*>(order_)) all_went_well &= TrySynchronise(node);
  if (!all_went_well) SynchroniseTree(root, SIZE_MAX);
}

void NodeRegistry::DropSomeUnheld() {
  for (int i = 0; i < 4 && !order_.empty(); ++i) {
    next_to_check_ = next_to_check_ + 1 < order_.size() ? next_to_check_ + 1 : 0;
    CNode* node = order_[next_to_check_];
    if (Py_REFCNT(lists_.find(node)->second.list.ptr()) != 1) continue;
    // One with a wrong item waits for whoever reads it, as long as somebody shows the node.
    if (TrySynchronise(node) || Find(node) == nullptr) DropList(node);
  }
  if (orphans_ >= orphan_limit_ && !IsUnderWay()) [[unlikely]]
    Tidy(nullptr);
}

void NodeRegistry::LeaveAnyList(CNode* node) {
  auto found = lists_.find(node);
  if (found == lists_.end()) return;
  if (Py_REFCNT(found->second.list.ptr()) != 1) {
    ++orphans_;
  } else {
    TrySynchronise(node);
    DropList(node);
  }
}

// False where the list holds what is no node.
bool NodeRegistry::TrySynchronise(CNode* node) {
  try {
    Synchronise(node);
    return true;
  } catch (nb::python_error&) {
    return false;
  }
}

// Brings the lists of a tree up to date; false, with some of them done, for a tree of more than `most` nodes.
bool NodeRegistry::SynchroniseTree(CNode* root, size_t most) {
  std::unordered_set<CNode*> seen;
  std::vector<CNode*> pending{root};
  while (!pending.empty()) {
    CNode* node = pending.back();
    pending.pop_back();
    Synchronise(node);
    if (node->child_count == 0 || !seen.insert(node).second) continue;
    if (node->child_count > most) return false;
    most -= node->child_count;
    for (CNode* child : node->fChildren()) {
      if (child != nullptr) pending.push_back(child);
    }
  }
  return true;
}

// The node of a list's item, null for None. It may be a node of another pool, which then lives as long as a wrapper may
// reach this one, or one with texts in another source, which lives as long as a wrapper may reach the node's pool.
CNode* NodeRegistry::Adopt(CNode* parent, const HostList& kept, nb::handle item) {
  if (item.is_none()) return nullptr;
  NodeRef& child = CheckedRef(item, NodeKind::kCNode);
  child.is_lone_bare_ = false;
  NodePool* pool = child.pool_.get();
  const bool is_foreign = pool != kept.pool.get();
  if (is_foreign) {
    Kept& own = kept_[kept.pool.get()];
    own.adopters.insert(parent);
    if (own.pools.emplace(pool, child.pool_).second) ++kept_[pool].holders;
  }
  if (child.source_ && (is_foreign || child.source_.get() != kept.source.get())) Pin(pool, child.source_);
  return child.node_;
}

}  // namespace quillet::host
