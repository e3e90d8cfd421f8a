// The node classes, with what they all have in common, and their records.
#include <array>
#include <unordered_map>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "tree/nodes.h"

namespace quillet::host {

namespace {

std::array<PyObject*, kNodeKindCount> g_classes{};

// ---- records ----

struct ClassInfoObject {
  CNodeClassInfo* info = nullptr;
  Ref<NodePool> pool;

  ~ClassInfoObject();
};

std::unordered_map<CNodeClassInfo*, PyObject*>& ClassInfoObjects() {
  static auto* objects = new std::unordered_map<CNodeClassInfo*, PyObject*>;
  return *objects;
}

ClassInfoObject::~ClassInfoObject() {
  if (info != nullptr) ClassInfoObjects().erase(info);
}

CNodeClassInfo* NewInfo(const Ref<HostPool>& pool, nb::handle cls, int32_t node_type, Text name) {
  const NodeKind kind = KindOfClass(cls);
  CNodeClassInfo* info = pool->NewClassInfo(kind, node_type, name);
  if (!cls.is(ClassOfKind(kind))) pool->classes.emplace(info, nb::borrow(cls));
  return info;
}

void InitClassInfo(nb::pointer_and_handle<ClassInfoObject> self, Any cls, Any nodetype, Any name) {
  const int32_t number = Int32Of(nodetype);
  const HostText name_text = HostText::FromStr(name, true);
  Ref<HostPool> pool(new HostPool);
  CNodeClassInfo* info = NewInfo(pool, cls, number, name_text.text());
  new (self.p) ClassInfoObject{info, Ref<NodePool>(pool.get())};
  ClassInfoObjects()[info] = self.h.ptr();
}

// ---- nodes ----

template <class T>
void InitNode(nb::pointer_and_handle<NodeHandle<T>> self, Any cls_info) {
  constexpr NodeKind kind = NodeKindRange<T>::kFirst;
  CNodeClassInfo* info = InfoOrNull(cls_info);
  CNode* node = info == nullptr ? NewBareNode(kind) : info->pool->Construct(kind, info);
  auto* handle = new (self.p) NodeHandle<T>();
  handle->Attach(self.h.ptr(), node, {});
  if (info == nullptr) handle->IsLoneBareNode();
}

void SetText(NodeRef& self, nb::handle value) {
  const HostText text = HostText::FromStr(value, true);
  CNode* node = self.node();
  const Text stored = node->pool->Intern(text.text());
  node->text = stored.data();
  node->text_length = static_cast<uint32_t>(stored.size());
  node->code = IsNone(stored) ? tok::REMOVED : CodeOfText(stored);
}

// The child at a place of a held list; null for an absent one and past the end.
NodeRef* HeldChild(nb::handle list, int64_t index) {
  const int64_t count = PyList_GET_SIZE(list.ptr());
  if (index >= count) return nullptr;
  if (index < 0) index += count;
  if (index < 0) ThrowError(ErrorKind::kIndexError, "list index out of range");
  nb::handle item = PyList_GET_ITEM(list.ptr(), index);
  return item.is_none() ? nullptr : &CheckedRef(item);
}

void BindNodeCore(nb::class_<NodeHandle<CNode>>& cls) {
  using Handle = NodeHandle<CNode>;
  cls.def_prop_rw(
      "fChildren", [](Handle& self) { return self.GetChildren(); },
      [](Handle& self, Any value) { self.SetChildren(value); }, nb::arg("value"));
  cls.def_prop_rw(
      "fText", [](Handle& self) { return StrOf(self.node()->fText()); },
      [](Handle& self, Any value) { SetText(self, value); }, nb::arg("value"));
  cls.def_prop_rw(
      "fContext", [](Handle& self) { return HostContext(self.node()->fContext); },
      [](Handle& self, Any value) {
        CNode* node = self.node();
        node->pool->SetContext(node, CoreContext(value, node->pool));
      },
      nb::arg("value"));
  cls.def_prop_ro("fClsInfo", [](Handle& self) { return WrapClassInfo(self.node()->fClsInfo); });
  cls.def_prop_ro("fNextFree", [](Handle& self) { return WrapNeighbour(self.node()->fNextFree); });

  // Where the host holds the list of children, that list is what it expects to be read.
  const auto count = [](Handle& self) {
    nb::object held = self.HeldChildren();
    return held.is_valid() ? int64_t{PyList_GET_SIZE(held.ptr())} : self.node()->GetChildCount();
  };
  const auto child_text = [](Handle& self, Any index) {
    const int64_t place = Int64Of(index);
    nb::object held = self.HeldChildren();
    if (!held.is_valid()) return StrOf(self.node()->GetChildText(place));
    NodeRef* child = HeldChild(held, place);
    if (child == nullptr && place < PyList_GET_SIZE(held.ptr())) ThrowNoAttribute("fText");
    return child == nullptr ? nb::object(nb::none()) : StrOf(child->node()->fText());
  };
  cls.def("GetChildCount", count).def("_GetChildCount", count);
  cls.def("GetChildText", child_text, nb::arg("index")).def("_GetChildText", child_text, nb::arg("index"));
  cls.def(
      "GetChild",
      [](Handle& self, Any index) {
        const int32_t place = Int32Of(index);
        nb::object held = self.HeldChildren();
        if (!held.is_valid()) return Wrap(self.node()->GetChild(place), self.source());
        NodeRef* child = HeldChild(held, place);
        return Wrap(child == nullptr ? nullptr : child->node(), self.source());
      },
      nb::arg("index"));
  cls.def("GetStateName", [](nb::handle self) {
    // A class of the host's own goes by its own name.
    CNode* node = CheckedRef(self).node();
    return node->fClsInfo == nullptr ? nb::object(nb::handle((PyObject*)Py_TYPE(self.ptr())).attr("__name__"))
                                     : StrOf(node->GetStateName());
  });
  DefOperation(
      cls, "_DoesChildTextMatch",
      [](Handle& self, Any text) {
        self.Synchronise();
        const HostText wanted = HostText::FromStr(text);
        return self.node()->DoesChildTextMatch(wanted.text());
      },
      nb::arg("text"));
  cls.def("__repr__", [](nb::handle self) {
    CNode* node = CheckedRef(self).node();
    nb::object state = node->fClsInfo == nullptr
                           ? nb::object(nb::handle((PyObject*)Py_TYPE(self.ptr())).attr("__name__"))
                           : StrOf(node->GetStateName());
    return nb::str("{}: {}").format(nb::repr(nb::handle((PyObject*)Py_TYPE(self.ptr()))), state);
  });
}

void BindNodeClasses(nb::module_& m) {
  const auto remember = [](NodeKind kind, nb::handle cls) {
    g_classes[static_cast<int>(kind)] = nb::borrow(cls).release().ptr();
    cls.attr("kSupportedRules") = nb::list();
  };
  const auto bind = [&]<class T, class Base>(NodeKind kind, const char* name, T*, Base*) {
    if constexpr (std::is_same_v<T, Base>) {
      nb::class_<NodeHandle<T>> cls(m, name, nb::type_slots(kNodeSlots), "A node of a syntax tree.");
      cls.def("__init__", &InitNode<T>, nb::arg("cls_info") = nb::none());
      remember(kind, cls);
      BindNodeCore(cls);
    } else {
      nb::class_<NodeHandle<T>, NodeHandle<Base>> cls(m, name);
      cls.def("__init__", &InitNode<T>, nb::arg("cls_info") = nb::none());
      remember(kind, cls);
    }
  };
#define QUILLET_NODE(name, base) \
  bind(NodeKind::k##name, #name, static_cast<name*>(nullptr), static_cast<base*>(nullptr));
#include "tree/node_kinds.def"
#define QUILLET_NODE_RULE(name, rule) \
  nb::cast<nb::list>(nb::handle(g_classes[static_cast<int>(NodeKind::k##name)]).attr("kSupportedRules")).append(rule);
#include "tree/node_kinds.def"
}

void BindClassInfo(nb::module_& m) {
  nb::class_<ClassInfoObject> info(m, "CNodeClassInfo",
                                   "The record of one parser state; it heads that state's free list.");
  info.def("__init__", &InitClassInfo, nb::arg("cls"), nb::arg("nodetype"), nb::arg("name"));
  info.def_prop_ro("fCls", [](ClassInfoObject& self) { return nb::borrow(ClassOfInfo(self.info)); });
  info.def_prop_ro("fNodeType", [](ClassInfoObject& self) { return self.info->fNodeType; });
  info.def_prop_ro("fName", [](ClassInfoObject& self) { return StrOf(self.info->fName); });
  info.def_prop_ro("fFirstFree", [](ClassInfoObject& self) { return WrapNeighbour(self.info->fFirstFree); });
}

}  // namespace

CNodeClassInfo* InfoOrNull(nb::handle object) {
  if (object.is_none()) return nullptr;
  ClassInfoObject* info = InstanceOf<ClassInfoObject>(object);
  if (info == nullptr) ThrowExpected("CNodeClassInfo", object);
  return info->info;
}

nb::handle ClassOfKind(NodeKind kind) { return g_classes[static_cast<int>(kind)]; }

bool IsNodeClass(nb::handle cls) {
  return PyType_Check(cls.ptr()) &&
         PyType_IsSubtype((PyTypeObject*)cls.ptr(), (PyTypeObject*)g_classes[static_cast<int>(NodeKind::kCNode)]);
}

NodeKind KindOfClass(nb::handle cls) {
  if (!IsNodeClass(cls)) ThrowExpected("a class derived from CNode", cls);
  // The nearest class of the catalogue; kinds are numbered in preorder, so the last match is it.
  int kind = 0;
  for (int i = 0; i < kNodeKindCount; ++i) {
    if (PyType_IsSubtype((PyTypeObject*)cls.ptr(), (PyTypeObject*)g_classes[i])) kind = i;
  }
  return static_cast<NodeKind>(kind);
}

nb::handle ClassOfInfo(CNodeClassInfo* info) {
  if (auto* pool = dynamic_cast<HostPool*>(info->pool)) {
    auto found = pool->classes.find(info);
    if (found != pool->classes.end()) return found->second;
  }
  return ClassOfKind(info->kind);
}

nb::object WrapClassInfo(CNodeClassInfo* info) {
  if (info == nullptr) return nb::none();
  auto found = ClassInfoObjects().find(info);
  if (found != ClassInfoObjects().end()) return nb::borrow(found->second);
  nb::object instance = nb::inst_alloc(nb::type<ClassInfoObject>());
  new (nb::inst_ptr<ClassInfoObject>(instance)) ClassInfoObject{info, Ref<NodePool>(info->pool)};
  nb::inst_mark_ready(instance);
  ClassInfoObjects()[info] = instance.ptr();
  return instance;
}

void BindNodes(nb::module_& tarvex) {
  BindNodeClasses(tarvex);
  BindClassInfo(tarvex);
}

}  // namespace quillet::host
