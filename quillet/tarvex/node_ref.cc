// Wrappers of nodes: identity, lifetime, and the host's lists of children. See node_ref.h.
#include "quillet/tarvex/node_ref.h"

#include <algorithm>
#include <array>
#include <unordered_set>

namespace quillet::host {

// All live wrappers, and what pools keep alive on their account. Guarded by the interpreter lock.
class NodeRegistry {
 public:
  static NodeRegistry& Get() {
    static auto* registry = new NodeRegistry;  // outlives the interpreter's last objects
    return *registry;
  }

  void Add(NodeRef* ref) {
    live_[ref->node_] = ref;
    ++ref->pool_->host_views;
  }

  // The wrapper is going: it must not be handed out any more.
  void Forget(NodeRef* ref) {
    auto found = live_.find(ref->node_);
    if (found != live_.end() && found->second == ref) live_.erase(found);
  }

  void Remove(NodeRef* ref) {
    if (--ref->pool_->host_views == 0) {
      // Moved out first: what goes with it may itself hold nodes.
      auto kept = kept_.extract(ref->pool_.get());
      ref->pool_->HostViewsDropped();
    }
  }

  NodeRef* Find(CNode* node) const {
    auto found = live_.find(node);
    return found == live_.end() || found->second->kind_ != node->kind ? nullptr : found->second;
  }

  // The wrapper again, for a node whose texts stand in `source` now.
  nb::object Reuse(NodeRef* ref, const Ref<SourceText>& source) {
    if (source) ref->source_ = source;
    return nb::borrow(ref->self_);
  }

  void HoldsChildren(NodeRef* ref) { with_children_.insert(ref); }
  void DropsChildren(NodeRef* ref) { with_children_.erase(ref); }
  void SynchroniseAll() {
    if (with_children_.empty()) [[likely]]
      return;
    // A list may let go of the last reference to a wrapper that is in the set, too.
    const std::vector<NodeRef*> refs(with_children_.begin(), with_children_.end());
    for (NodeRef* ref : refs) {
      if (!with_children_.contains(ref)) continue;
      nb::object keep = nb::borrow(ref->self_);
      ref->Synchronise();
    }
  }

  // Nodes of `pool` refer to nodes of another one, or to texts of another source.
  void Link(NodePool* pool, const NodeRef& child) {
    Kept& kept = kept_[pool];
    if (child.pool_.get() != pool) kept.pools.emplace(child.pool_.get(), child.pool_);
    if (child.source_) Pin(pool, child.source_);
  }

  void RehomeTexts(NodePool& pool) {
    for (const CNode* reached : Reach()) {
      auto* node = const_cast<CNode*>(reached);
      if (node->pool == &pool && node->text != nullptr) node->text = pool.Intern(node->fText()).data();
    }
  }

  void Pin(NodePool* pool, const Ref<SourceText>& source) {
    Kept& kept = kept_[pool];
    if (!kept.sources.empty() && kept.sources.back().get() == source.get()) return;
    if (kept.sources.size() >= kept.sweep_at) Sweep(kept);
    kept.sources.push_back(source);
  }

 private:
  struct Kept {
    std::vector<Ref<SourceText>> sources;
    std::unordered_map<NodePool*, Ref<NodePool>> pools;
    size_t sweep_at = 64;
  };

  // All nodes that a host may get at from its wrappers.
  std::unordered_set<const CNode*> Reach() const {
    std::unordered_set<const CNode*> seen;
    std::vector<const CNode*> pending;
    for (const auto& [node, ref] : live_) pending.push_back(node);
    while (!pending.empty()) {
      const CNode* node = pending.back();
      pending.pop_back();
      if (!seen.insert(node).second) continue;
      for (const CNode* child : node->fChildren()) {
        if (child != nullptr) pending.push_back(child);
      }
    }
    return seen;
  }

  // Drops the sources that no node in reach of a wrapper refers to.
  void Sweep(Kept& kept) {
    std::sort(kept.sources.begin(), kept.sources.end(),
              [](const auto& a, const auto& b) { return a->begin() < b->begin(); });
    std::vector<bool> used(kept.sources.size());
    for (const CNode* node : Reach()) {
      if (node->text == nullptr) continue;
      auto after = std::upper_bound(kept.sources.begin(), kept.sources.end(), node->text,
                                    [](const char* text, const auto& source) { return text < source->begin(); });
      if (after == kept.sources.begin()) continue;
      const size_t index = static_cast<size_t>(after - kept.sources.begin()) - 1;
      if (kept.sources[index]->Holds(node->text)) used[index] = true;
    }
    size_t left = 0;
    for (size_t i = 0; i < kept.sources.size(); ++i) {
      if (used[i]) std::swap(kept.sources[left++], kept.sources[i]);
    }
    kept.sources.resize(left);
    kept.sweep_at = std::max<size_t>(64, left * 2);
  }

  std::unordered_map<CNode*, NodeRef*> live_;
  std::unordered_set<NodeRef*> with_children_;
  std::unordered_map<NodePool*, Kept> kept_;
};

namespace {

// Nodes without a record that a host made and let go of before they had a place in a tree, by kind.
std::array<std::vector<CNode*>, kNodeKindCount>& LoneBareNodes() {
  static auto* nodes = new std::array<std::vector<CNode*>, kNodeKindCount>;
  return *nodes;
}

template <class T>
void ConstructHandle(void* storage) {
  new (storage) NodeHandle<T>();
}

nb::object NewWrapper(CNode* node, Ref<SourceText> source) {
  nb::handle cls = ClassOfKind(node->kind);
  nb::object instance = nb::inst_alloc(cls);
  switch (node->kind) {
#define QUILLET_NODE(name, base)                         \
  case NodeKind::k##name:                                \
    ConstructHandle<name>(nb::inst_ptr<void>(instance)); \
    break;
#include "tree/node_kinds.def"
  }
  nb::inst_mark_ready(instance);
  static_cast<NodeRef*>(nb::inst_ptr<NodeHandle<CNode>>(instance))->Attach(instance.ptr(), node, std::move(source));
  return instance;
}

}  // namespace

void NodeRef::ThrowStale() {
  ThrowError(ErrorKind::kRuntimeError, "the node was discarded and serves as a node of another class");
}

void NodeRef::Attach(PyObject* self, CNode* node, Ref<SourceText> source) {
  node_ = node;
  kind_ = node->kind;
  self_ = self;
  pool_ = node->pool;
  source_ = std::move(source);
  NodeRegistry::Get().Add(this);
}

NodeRef::~NodeRef() {
  if (node_ == nullptr) return;
  NodeRegistry::Get().Forget(this);
  if (children_.is_valid()) {
    try {
      Synchronise();
    } catch (...) {
      // A list that holds what is no node never reaches the node.
    }
    DropChildren();
  }
  if (is_lone_bare_ && !node_->has_children && !node_->given_back) {
    pool_->WipeLeafFields(node_);
    LoneBareNodes()[static_cast<int>(kind_)].push_back(node_);
  }
  NodeRegistry::Get().Remove(this);
}

void NodeRef::DropChildren() {
  NodeRegistry::Get().DropsChildren(this);
  synchronised_.clear();
  nb::object list = std::move(children_);
  children_ = nb::object();
}

void NodeRef::Synchronise() {
  if (!children_.is_valid()) return;
  const std::span<CNode* const> native = node_->fChildren();
  const bool is_same_node = node_->kind == kind_ && node_->has_children &&
                            std::equal(native.begin(), native.end(), synchronised_.begin(), synchronised_.end());
  if (!is_same_node) {
    DropChildren();
    return;
  }
  PyObject* list = children_.ptr();
  const size_t count = static_cast<size_t>(PyList_GET_SIZE(list));
  const auto item_node = [&](size_t i) -> NodeRef* {
    nb::handle item = PyList_GET_ITEM(list, static_cast<Py_ssize_t>(i));
    if (item.is_none()) return nullptr;
    if (!PyObject_TypeCheck(item.ptr(), (PyTypeObject*)ClassOfKind(NodeKind::kCNode).ptr()) || !nb::inst_ready(item))
      ThrowExpected("CNode", item);
    return nb::inst_ptr<NodeHandle<CNode>>(item);
  };
  bool same = count == synchronised_.size();
  std::vector<CNode*> nodes(count);
  for (size_t i = 0; i < count; ++i) {
    NodeRef* ref = item_node(i);
    nodes[i] = ref == nullptr ? nullptr : ref->node_;
    if (ref != nullptr) ref->is_lone_bare_ = false;
    if (same && nodes[i] != synchronised_[i]) same = false;
    if (ref != nullptr && (ref->pool_.get() != pool_.get() || ref->source_.get() != source_.get()))
      NodeRegistry::Get().Link(pool_.get(), *ref);
  }
  if (same) return;
  std::copy(nodes.begin(), nodes.end(), pool_->ResizeChildren(node_, static_cast<uint32_t>(count)));
  synchronised_ = std::move(nodes);
}

void NodeRef::KeepChildren(nb::handle list) {
  children_ = nb::borrow(list);
  const std::span<CNode* const> native = node_->fChildren();
  synchronised_.assign(native.begin(), native.end());
  NodeRegistry::Get().HoldsChildren(this);
}

nb::object NodeRef::GetChildren() {
  CNode* self = node();
  Synchronise();
  if (children_.is_valid()) return children_;
  if (!self->has_children) return nb::none();
  KeepChildren(WrapList(self->fChildren(), source_));
  return children_;
}

void NodeRef::SetChildren(nb::handle list) {
  CNode* self = node();
  if (list.is_none()) {
    if (children_.is_valid()) DropChildren();
    pool_->ClearChildren(self);
    return;
  }
  if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
  const std::vector<CNode*> nodes = NodesOf(list, NodeKind::kCNode, true);
  if (children_.is_valid()) DropChildren();
  std::copy(nodes.begin(), nodes.end(), pool_->ResizeChildren(self, static_cast<uint32_t>(nodes.size())));
  KeepChildren(list);
  Synchronise();  // links what the nodes need
}

nb::object Wrap(CNode* node, const Ref<SourceText>& source) {
  if (node == nullptr) return nb::none();
  if (NodeRef* ref = NodeRegistry::Get().Find(node)) return NodeRegistry::Get().Reuse(ref, source);
  return NewWrapper(node, source);
}

nb::object WrapList(std::span<CNode* const> nodes, const Ref<SourceText>& source) {
  nb::object list = nb::steal(PyList_New(static_cast<Py_ssize_t>(nodes.size())));
  if (!list.is_valid()) throw nb::python_error();
  for (size_t i = 0; i < nodes.size(); ++i) PyList_SET_ITEM(list.ptr(), i, Wrap(nodes[i], source).release().ptr());
  return list;
}

NodeRef& RefOf(nb::handle object, NodeKind wanted) {
  if (!PyObject_TypeCheck(object.ptr(), (PyTypeObject*)ClassOfKind(wanted).ptr()) || !nb::inst_ready(object))
    ThrowExpected(NameOfNodeKind(wanted), object);
  NodeRegistry::Get().SynchroniseAll();
  return *nb::inst_ptr<NodeHandle<CNode>>(object);
}

NodeRef* RefOrNull(nb::handle object, NodeKind wanted) { return object.is_none() ? nullptr : &RefOf(object, wanted); }

std::vector<CNode*> NodesOf(nb::handle list, NodeKind wanted, bool none) {
  if (!PyList_Check(list.ptr()) && !PyTuple_Check(list.ptr())) ThrowExpected("list", list);
  std::vector<CNode*> nodes;
  for (nb::handle item : list) {
    nodes.push_back(none && item.is_none() ? nullptr : RefOf(item, wanted).node());
  }
  return nodes;
}

nb::handle ClassOfNode(CNode* node) {
  NodeRef* ref = NodeRegistry::Get().Find(node);
  return ref == nullptr ? ClassOfKind(node->kind)
                        : nb::handle((PyObject*)Py_TYPE(NodeRegistry::Get().Reuse(ref, {}).ptr()));
}

CNode* NewBareNode(NodeKind kind) {
  static auto* pool = new Ref<NodePool>(new NodePool);  // of the process
  std::vector<CNode*>& lone = LoneBareNodes()[static_cast<int>(kind)];
  if (lone.empty()) return (*pool)->Construct(kind, nullptr);
  CNode* node = lone.back();
  lone.pop_back();
  return node;
}

void RehomeTexts(NodePool& pool) {
  if (pool.host_views == 0) [[likely]]
    return;
  NodeRegistry::Get().RehomeTexts(pool);
}

void PinSource(NodePool& pool, const Ref<SourceText>& source) {
  if (pool.host_views == 0 || !source) [[likely]]
    return;
  NodeRegistry::Get().Pin(&pool, source);
}

}  // namespace quillet::host
