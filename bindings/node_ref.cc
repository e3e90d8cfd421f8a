// Wrappers of nodes: identity, lifetime, and the host's lists of children. See node_ref.h.
#include "bindings/node_ref.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <unordered_set>
#include <utility>

#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_registry.h"

namespace quillet::host {

NodeRef& CheckedRef(nb::handle object, NodeKind wanted) {
  if (!PyObject_TypeCheck(object.ptr(), (PyTypeObject*)ClassOfKind(wanted).ptr()) || !nb::inst_ready(object))
    ThrowExpected(NameOfNodeKind(wanted), object);
  return *nb::inst_ptr<NodeHandle<CNode>>(object);
}

std::array<std::vector<CNode*>, kNodeKindCount>& LoneBareNodes() {
  static auto* nodes = new std::array<std::vector<CNode*>, kNodeKindCount>;
  return *nodes;
}

namespace {

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
  NodeRegistry& registry = NodeRegistry::Get();
  registry.Add(this);
  // A wrapper refers to nothing but its list, so without one it is no object of the collector's. One of a class of the
  // host's has fields of its own.
  if (Py_TYPE(self) == (PyTypeObject*)ClassOfKind(kind_).ptr() && registry.PeekList(node) == nullptr)
    PyObject_GC_UnTrack(self);
}

NodeRef::~NodeRef() {
  if (node_ == nullptr) return;
  const Operation operation;
  NodeRegistry& registry = NodeRegistry::Get();
  registry.Forget(this);
  if (is_lone_bare_ && !node_->has_children && !node_->given_back) {
    pool_->WipeLeafFields(node_);
    LoneBareNodes()[static_cast<int>(kind_)].push_back(node_);
  } else if (node_->text != nullptr || node_->has_children) {
    pool_->CountStray();
  }
  registry.LeaveList(node_);
  registry.EndView(pool_);
  LetGo(std::move(source_));
  LetGo(std::move(pool_));
}

// ---- the collector ----

// A wrapper that was made for a node that serves as another class by now has no part in its list.
PyObject* NodeRef::OwnList() const {
  if (node_ == nullptr || NodeRegistry::Get().Find(node_) != this) return nullptr;
  return NodeRegistry::Get().PeekList(node_);
}

namespace {

NodeRef* ReadyRef(PyObject* self) { return nb::inst_ready(self) ? nb::inst_ptr<NodeHandle<CNode>>(self) : nullptr; }

int TraverseNode(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (const NodeRef* ref = ReadyRef(self)) Py_VISIT(ref->OwnList());
  return 0;
}

// The collector calls this before it clears anything that is out of reach, such as the list: the node takes over what
// that holds. A wrapper that goes because nobody refers to it any more leaves its list in its destructor.
void FinalizeNode(PyObject* self) {
  NodeRef* ref = ReadyRef(self);
  if (Py_REFCNT(self) == 1 || ref == nullptr || ref->OwnList() == nullptr) return;
  PyObject *type, *value, *traceback;
  PyErr_Fetch(&type, &value, &traceback);
  try {
    ref->Synchronise();
  } catch (nb::python_error&) {  // what is no node is left out
  } catch (const Error&) {
  }
  ref->DropList();
  PyErr_Restore(type, value, traceback);
}

int ClearNode(PyObject* self) {
  NodeRef* ref = ReadyRef(self);
  if (ref != nullptr && ref->OwnList() != nullptr) ref->DropList();
  return 0;
}

}  // namespace

const PyType_Slot kNodeSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseNode)},
                                  {Py_tp_clear, reinterpret_cast<void*>(ClearNode)},
                                  {Py_tp_finalize, reinterpret_cast<void*>(FinalizeNode)},
                                  {0, nullptr}};

// ---- the host's view of a node ----

void NodeRef::DropList() { NodeRegistry::Get().DropList(node_); }

void NodeRef::Synchronise() { NodeRegistry::Get().Synchronise(node()); }

nb::object NodeRef::HeldChildren() { return NodeRegistry::Get().ListOf(node()); }

nb::object NodeRef::GetChildren() {
  NodeRegistry& registry = NodeRegistry::Get();
  registry.DropSomeUnheld();
  CNode* self = node();
  if (nb::object held = registry.ListOf(self); held.is_valid()) return held;
  if (!self->has_children) return nb::none();
  std::vector<CNode*> nodes(self->fChildren().begin(), self->fChildren().end());
  nb::object list = WrapList(nodes, source_);
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
  const Operation operation;
  FreeRetiredArrays(*pool_);
  auto replaced = registry.TakeList(self);
  std::copy(nodes.begin(), nodes.end(), pool_->ResizeChildren(self, static_cast<uint32_t>(count)));
  registry.KeepList(self, source_, nb::borrow(list), std::move(nodes));
  registry.Synchronise(self);  // adopts the nodes
  if (replaced) {
    registry.EndView(replaced.mapped().pool);
    LetGo(std::move(replaced));
  }
}

nb::object Wrap(CNode* node, const Ref<SourceText>& source) {
  if (node == nullptr) return nb::none();
  if (NodeRef* ref = NodeRegistry::Get().Find(node)) return NodeRegistry::Get().Reuse(ref, source);
  return NewWrapper(node, source);
}

nb::object WrapNeighbour(CNode* node) {
  if (node == nullptr) return nb::none();
  NodeRegistry& registry = NodeRegistry::Get();
  if (IsUnderWay() && registry.Find(node) == nullptr) return nb::none();  // the core may work on it
  registry.MakeSafe(node);
  return Wrap(node, {});
}

nb::object WrapList(std::span<CNode* const> nodes, const Ref<SourceText>& source) {
  const WithoutCollector all_at_once;
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

void FreeRetiredArrays(NodePool& pool) {
  if (!IsAnotherUnderWay()) pool.FreeRetiredArrays();
}

void PinSource(NodePool& pool, SourceText* source) {
  FreeRetiredArrays(pool);
  if (pool.host_views == 0 && !pool.MayHoldStrays()) [[likely]]
    return;
  NodeRegistry::Get().TidyBeforeParse(&pool);
  if (pool.host_views != 0 && source != nullptr) NodeRegistry::Get().Pin(&pool, source);
}

}  // namespace quillet::host
