// Wrappers of nodes: identity, lifetime, and the host's lists of children. See node_ref.h.
#include "quillet/tarvex/node_ref.h"

#include <algorithm>
#include <array>
#include <unordered_set>

namespace quillet::host {

namespace {

// The handle of a wrapper; TypeError for anything else.
NodeRef& CheckedRef(nb::handle object, NodeKind wanted) {
  if (!PyObject_TypeCheck(object.ptr(), (PyTypeObject*)ClassOfKind(wanted).ptr()) || !nb::inst_ready(object))
    ThrowExpected(NameOfNodeKind(wanted), object);
  return *nb::inst_ptr<NodeHandle<CNode>>(object);
}

}  // namespace

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

  void EndView(const Ref<NodePool>& pool) {
    if (--pool->host_views != 0) return;
    // Moved out first: what goes with it may itself hold nodes.
    auto kept = kept_.extract(pool.get());
    pool->HostViewsDropped();
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

  // ---- the host's lists of children ----

  nb::object ListOf(CNode* node) const {
    auto found = lists_.find(node);
    return found == lists_.end() ? nb::object() : found->second.list;
  }

  // Makes a list that has the node's children the host's own.
  void KeepList(CNode* node, const Ref<SourceText>& source, nb::object list) {
    const std::span<CNode* const> native = node->fChildren();
    HostList& kept = lists_[node];
    kept = {std::move(list), {native.begin(), native.end()}, node->pool, source};
    ++node->pool->host_views;
  }

  void DropList(CNode* node) {
    auto dropped = lists_.extract(node);
    if (dropped) EndView(dropped.mapped().pool);
    // The list goes here, and with it wrappers, which find the registry as it is to be.
  }

  void Synchronise(CNode* node) {
    auto found = lists_.find(node);
    if (found == lists_.end()) return;
    HostList& kept = found->second;
    const std::span<CNode* const> native = node->fChildren();
    if (!node->has_children ||
        !std::equal(native.begin(), native.end(), kept.synchronised.begin(), kept.synchronised.end()))
      return DropList(node);
    PyObject* list = kept.list.ptr();
    const auto count = static_cast<size_t>(PyList_GET_SIZE(list));
    std::vector<CNode*> nodes(count);
    for (size_t i = 0; i < count; ++i) nodes[i] = Adopt(kept, PyList_GET_ITEM(list, static_cast<Py_ssize_t>(i)));
    if (nodes == kept.synchronised) return;
    std::copy(nodes.begin(), nodes.end(), node->pool->ResizeChildren(node, static_cast<uint32_t>(count)));
    kept.synchronised = std::move(nodes);
  }

  void SynchroniseAll() {
    if (lists_.empty()) [[likely]]
      return;
    std::vector<CNode*> nodes;
    nodes.reserve(lists_.size());
    for (const auto& [node, kept] : lists_) nodes.push_back(node);
    for (CNode* node : nodes) {
      Synchronise(node);
      auto found = lists_.find(node);
      if (found != lists_.end() && Py_REFCNT(found->second.list.ptr()) == 1) DropList(node);
    }
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

  struct HostList {
    nb::object list;
    std::vector<CNode*> synchronised;  // what list and node had in common last
    Ref<NodePool> pool;
    Ref<SourceText> source;
  };

  // The node of a list's item, null for None. It may be a node of another pool, or one with texts in
  // another source, which then live as long as nodes of this pool are seen.
  CNode* Adopt(const HostList& kept, nb::handle item) {
    if (item.is_none()) return nullptr;
    NodeRef& child = CheckedRef(item, NodeKind::kCNode);
    child.is_lone_bare_ = false;
    if (child.pool_.get() != kept.pool.get()) kept_[kept.pool.get()].pools.emplace(child.pool_.get(), child.pool_);
    if (child.source_ && child.source_.get() != kept.source.get()) Pin(kept.pool.get(), child.source_);
    return child.node_;
  }

  // All nodes that a host may get at from its wrappers.
  std::unordered_set<const CNode*> Reach() const {
    std::unordered_set<const CNode*> seen;
    std::vector<const CNode*> pending;
    for (const auto& [node, ref] : live_) pending.push_back(node);
    for (const auto& [node, kept] : lists_) pending.push_back(node);
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
  std::unordered_map<CNode*, HostList> lists_;
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
  nb::object instance =
      nb::inst_alloc(node->fClsInfo == nullptr ? ClassOfKind(node->kind) : ClassOfInfo(node->fClsInfo));
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
  NodeRegistry& registry = NodeRegistry::Get();
  registry.Forget(this);
  if (is_lone_bare_ && !node_->has_children && !node_->given_back) {
    pool_->WipeLeafFields(node_);
    LoneBareNodes()[static_cast<int>(kind_)].push_back(node_);
  }
  registry.EndView(pool_);
}

void NodeRef::Synchronise() { NodeRegistry::Get().Synchronise(node()); }

nb::object NodeRef::GetChildren() {
  NodeRegistry& registry = NodeRegistry::Get();
  registry.SynchroniseAll();
  CNode* self = node();
  nb::object list = registry.ListOf(self);
  if (list.is_valid()) return list;
  if (!self->has_children) return nb::none();
  list = WrapList(self->fChildren(), source_);
  registry.KeepList(self, source_, list);
  return list;
}

void NodeRef::SetChildren(nb::handle list) {
  CNode* self = node();
  if (!list.is_none() && !PyList_Check(list.ptr())) ThrowExpected("list", list);
  NodeRegistry& registry = NodeRegistry::Get();
  if (list.is_none()) {
    registry.DropList(self);
    pool_->ClearChildren(self);
    return;
  }
  const std::vector<CNode*> nodes = NodesOf(list, NodeKind::kCNode, true);
  registry.DropList(self);
  std::copy(nodes.begin(), nodes.end(), pool_->ResizeChildren(self, static_cast<uint32_t>(nodes.size())));
  registry.KeepList(self, source_, nb::borrow(list));
  registry.Synchronise(self);  // adopts the nodes
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
  NodeRef& ref = CheckedRef(object, wanted);
  NodeRegistry::Get().SynchroniseAll();
  return ref;
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
