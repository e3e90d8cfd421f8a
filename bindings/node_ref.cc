// Wrappers of nodes: identity, lifetime, and the host's lists of children. See node_ref.h.
#include "bindings/node_ref.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <unordered_set>
#include <utility>

#include "bindings/errors.h"

namespace quillet::host {

namespace {

const bool g_tells_when_the_core_waits = [] {
  NodePool::is_core_waiting = &HostCall::IsUnderWay;
  return true;
}();

}  // namespace

NodeRef& CheckedRef(nb::handle object, NodeKind wanted) {
  if (!PyObject_TypeCheck(object.ptr(), (PyTypeObject*)ClassOfKind(wanted).ptr()) || !nb::inst_ready(object))
    ThrowExpected(NameOfNodeKind(wanted), object);
  return *nb::inst_ptr<NodeHandle<CNode>>(object);
}

// All live wrappers, and what pools keep alive on their account. Guarded by the interpreter lock.
//
// Letting go of a list or of a pool may run any code of the host's, which comes back here. So what
// goes is first taken out of the tables and destroyed when nothing else is left to do.
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
    pool->HostViewsDropped();
    if (!kept_.empty()) LetGo(pool.get());
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

  // The list that the host holds of the node's children, if the core left the node alone since.
  nb::object ListOf(CNode* node) {
    auto found = lists_.find(node);
    if (found == lists_.end()) return nb::object();
    if (IsCurrent(node, found->second)) return found->second.list;
    DropList(node);
    return nb::object();
  }

  // Makes a list that has these children of the node, which has no list yet, the host's own.
  void KeepList(CNode* node, const Ref<SourceText>& source, nb::object list, std::vector<CNode*> nodes) {
    held_items_ += nodes.size();
    lists_.emplace(node, HostList{std::move(list), std::move(nodes), node->pool, source, order_.size()});
    order_.push_back(node);
    ++node->pool->host_views;
  }

  // Takes a list out of the tables. It goes with the result, and with it wrappers, which find the
  // registry as it is to be.
  auto TakeList(CNode* node) {
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

  void DropList(CNode* node) {
    auto dropped = TakeList(node);
    if (dropped) EndView(dropped.mapped().pool);
  }

  void Synchronise(CNode* node) {
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

  // Brings the lists of the node and of all nodes below it up to date, in time bounded by the lesser
  // of what there is below it and what the host holds.
  void SynchroniseBelow(CNode* root) {
    if (lists_.empty()) [[likely]]
      return;
    DropSomeUnheld();
    if (SynchroniseTree(root, held_items_ + lists_.size())) return;
    // A list elsewhere that has a wrong item is nothing to this operation.
    bool all_went_well = true;
    for (CNode* node : std::vector<CNode*>(order_)) all_went_well &= TrySynchronise(node);
    if (!all_went_well) SynchroniseTree(root, SIZE_MAX);
  }

  // Lets go of lists that nobody else holds, a few at each call: by the time that there are many, there
  // were as many calls.
  void DropSomeUnheld() {
    for (int i = 0; i < 4 && !order_.empty(); ++i) {
      next_to_check_ = next_to_check_ + 1 < order_.size() ? next_to_check_ + 1 : 0;
      CNode* node = order_[next_to_check_];
      if (Py_REFCNT(lists_.find(node)->second.list.ptr()) != 1) continue;
      // One with a wrong item waits for whoever reads it, as long as somebody shows the node.
      if (TrySynchronise(node) || Find(node) == nullptr) DropList(node);
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

  // Makes a node that no wrapper showed so far safe to show: what no wrapper reaches has texts and
  // children that may be gone.
  void MakeSafe(CNode* node) {
    if ((node->text == nullptr && !node->has_children) || Find(node) != nullptr) return;
    if (!Reach().contains(node)) {
      node->pool->ClearChildren(node);
      node->pool->WipeLeafFields(node);
      return;
    }
    // It is in a tree whose source is not known here.
    std::unordered_map<SourceText*, Ref<SourceText>> sources;
    for (const auto& [other, ref] : live_) {
      if (ref->source_) sources.emplace(ref->source_.get(), ref->source_);
    }
    for (const auto& [key, source] : sources) Pin(node->pool, source);
  }

 private:
  // What a pool's nodes refer to outside of it. It stays as long as a wrapper may reach the pool.
  struct Kept {
    std::vector<Ref<SourceText>> sources;
    std::unordered_map<NodePool*, Ref<NodePool>> pools;
    std::unordered_set<CNode*> adopters;  // nodes of the pool that were given children of others
    size_t holders = 0;                   // pools that keep this one
    size_t sweep_at = 64;
    bool is_marked = false;
  };
  using KeptMap = std::unordered_map<NodePool*, Kept>;

  struct HostList {
    nb::object list;
    std::vector<CNode*> synchronised;  // what list and node had in common last
    Ref<NodePool> pool;
    Ref<SourceText> source;
    size_t place;  // in order_
  };

  static bool IsCurrent(const CNode* node, const HostList& kept) {
    const std::span<CNode* const> native = node->fChildren();
    return node->has_children &&
           std::equal(native.begin(), native.end(), kept.synchronised.begin(), kept.synchronised.end());
  }

  // False where the list holds what is no node.
  bool TrySynchronise(CNode* node) {
    try {
      Synchronise(node);
      return true;
    } catch (nb::python_error&) {
      return false;
    }
  }

  // Brings the lists of a tree up to date; false, with some of them done, for a tree of more than
  // `most` nodes.
  bool SynchroniseTree(CNode* root, size_t most) {
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

  // The node of a list's item, null for None. It may be a node of another pool, which then lives as
  // long as a wrapper may reach this one, or one with texts in another source, which lives as long as
  // a wrapper may reach the node's pool.
  CNode* Adopt(CNode* parent, const HostList& kept, nb::handle item) {
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

  // Drops what a pool without wrappers keeps, unless a pool that wrappers may reach keeps it, and so
  // on for the pools it kept.
  void LetGo(NodePool* pool) {
    std::vector<KeptMap::node_type> dropped;
    std::vector<NodePool*> pending{pool};
    while (!pending.empty()) {
      auto found = kept_.find(pending.back());
      pending.pop_back();
      if (found == kept_.end() || found->first->host_views != 0) continue;
      if (found->second.holders == 0) {
        for (const auto& [other, ref] : found->second.pools) {
          --kept_.find(other)->second.holders;
          pending.push_back(other);
        }
        Drop(found, dropped);
      } else {
        ++suspects_;
      }
    }
    // Pools may keep each other in a ring. To look for one takes a pass over all of them, so it is done
    // once for so many that may be in one.
    if (suspects_ * 16 >= kept_.size() + 1) DropRings(dropped);
  }

  // Drops all that no pool with wrappers keeps.
  void DropRings(std::vector<KeptMap::node_type>& dropped) {
    suspects_ = 0;
    std::vector<Kept*> pending;
    for (auto& [pool, kept] : kept_) {
      kept.is_marked = pool->host_views != 0;
      if (kept.is_marked) pending.push_back(&kept);
    }
    while (!pending.empty()) {
      const Kept& kept = *pending.back();
      pending.pop_back();
      for (const auto& [other, ref] : kept.pools) {
        Kept& next = kept_.find(other)->second;
        if (!std::exchange(next.is_marked, true)) pending.push_back(&next);
      }
    }
    for (auto at = kept_.begin(); at != kept_.end();) {
      auto found = at++;
      if (found->second.is_marked) continue;
      for (const auto& [other, ref] : found->second.pools) {
        if (auto kept = kept_.find(other); kept != kept_.end()) --kept->second.holders;
      }
      Drop(found, dropped);
    }
  }

  // Takes an entry out. The nodes that have children of other pools lose them: they may stand on a free
  // list, where a host can find them again.
  void Drop(KeptMap::iterator found, std::vector<KeptMap::node_type>& dropped) {
    NodePool* pool = found->first;
    for (CNode* node : found->second.adopters) {
      const std::span<CNode* const> children = node->fChildren();
      if (std::any_of(children.begin(), children.end(),
                      [pool](const CNode* child) { return child != nullptr && child->pool != pool; }))
        pool->ClearChildren(node);
    }
    dropped.push_back(kept_.extract(found));
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
  std::vector<CNode*> order_;  // the nodes of lists_
  size_t next_to_check_ = 0;   // in order_, see DropSomeUnheld
  size_t held_items_ = 0;      // of all lists, when they were synchronised last
  KeptMap kept_;
  size_t suspects_ = 0;  // pools without wrappers that others keep, found since the last DropRings
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
  // A host may have made the node of another class than that of its record.
  const bool is_of_class_of_record = node->fClsInfo != nullptr && node->fClsInfo->kind == node->kind;
  nb::object instance = nb::inst_alloc(is_of_class_of_record ? ClassOfInfo(node->fClsInfo) : ClassOfKind(node->kind));
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

nb::object NodeRef::HeldChildren() { return NodeRegistry::Get().ListOf(node()); }

nb::object NodeRef::GetChildren() {
  NodeRegistry& registry = NodeRegistry::Get();
  registry.DropSomeUnheld();
  CNode* self = node();
  if (nb::object held = registry.ListOf(self); held.is_valid()) return held;
  if (!self->has_children) return nb::none();
  // A copy, since making wrappers may run the collector and with it code of the host's.
  std::vector<CNode*> nodes(self->fChildren().begin(), self->fChildren().end());
  nb::object list = WrapList(nodes, source_);
  if (nb::object held = registry.ListOf(self); held.is_valid()) return held;
  registry.KeepList(self, source_, list, std::move(nodes));
  return list;
}

void NodeRef::SetChildren(nb::handle list) {
  CNode* self = node();
  if (!list.is_none() && !PyList_Check(list.ptr())) ThrowExpected("list", list);
  NodeRegistry& registry = NodeRegistry::Get();
  registry.DropSomeUnheld();
  if (list.is_none()) {
    pool_->ClearChildren(self);
    registry.DropList(self);
    return;
  }
  // Nothing is changed where an item is no node.
  const auto count = static_cast<size_t>(PyList_GET_SIZE(list.ptr()));
  std::vector<CNode*> nodes(count);
  for (size_t i = 0; i < count; ++i) {
    nb::handle item = PyList_GET_ITEM(list.ptr(), static_cast<Py_ssize_t>(i));
    if (!item.is_none()) nodes[i] = CheckedRef(item, NodeKind::kCNode).node();
  }
  auto replaced = registry.TakeList(self);
  std::copy(nodes.begin(), nodes.end(), pool_->ResizeChildren(self, static_cast<uint32_t>(count)));
  registry.KeepList(self, source_, nb::borrow(list), std::move(nodes));
  registry.Synchronise(self);  // adopts the nodes
  if (replaced) registry.EndView(replaced.mapped().pool);
}

nb::object Wrap(CNode* node, const Ref<SourceText>& source) {
  if (node == nullptr) return nb::none();
  if (NodeRef* ref = NodeRegistry::Get().Find(node)) return NodeRegistry::Get().Reuse(ref, source);
  return NewWrapper(node, source);
}

nb::object WrapNeighbour(CNode* node) {
  if (node == nullptr) return nb::none();
  NodeRegistry& registry = NodeRegistry::Get();
  if (HostCall::IsUnderWay() && registry.Find(node) == nullptr) return nb::none();  // the core may work on it
  registry.MakeSafe(node);
  return Wrap(node, {});
}

nb::object WrapList(std::span<CNode* const> nodes, const Ref<SourceText>& source) {
  nb::object list = nb::steal(PyList_New(static_cast<Py_ssize_t>(nodes.size())));
  if (!list.is_valid()) throw nb::python_error();
  for (size_t i = 0; i < nodes.size(); ++i) PyList_SET_ITEM(list.ptr(), i, Wrap(nodes[i], source).release().ptr());
  return list;
}

NodeRef& RefOf(nb::handle object, NodeKind wanted) {
  NodeRef& ref = CheckedRef(object, wanted);
  NodeRegistry::Get().SynchroniseBelow(ref.node());
  return ref;
}

NodeRef* RefOrNull(nb::handle object, NodeKind wanted) { return object.is_none() ? nullptr : &RefOf(object, wanted); }

std::vector<CNode*> NodesOf(nb::handle list, NodeKind wanted, bool none) {
  if (!PyList_Check(list.ptr()) && !PyTuple_Check(list.ptr())) ThrowExpected("list", list);
  const auto is_absent = [none](nb::handle item) { return none && item.is_none(); };
  const auto count = [list] { return PySequence_Fast_GET_SIZE(list.ptr()); };
  const auto item = [list](Py_ssize_t i) { return nb::handle(PySequence_Fast_GET_ITEM(list.ptr(), i)); };
  for (Py_ssize_t i = 0; i < count(); ++i) {
    if (!is_absent(item(i))) RefOf(item(i), wanted);
  }
  // Nothing of the host's runs from here on, so that the list still holds all that is returned.
  std::vector<CNode*> nodes;
  for (Py_ssize_t i = 0; i < count(); ++i)
    nodes.push_back(is_absent(item(i)) ? nullptr : CheckedRef(item(i), wanted).node());
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
