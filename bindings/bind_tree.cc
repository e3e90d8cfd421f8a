// The node classes, their records, the factory, and the argument records.
#include <array>
#include <unordered_map>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "tree/arg_info.h"
#include "tree/factory.h"
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

CNodeClassInfo* InfoOrNull(nb::handle object) {
  if (object.is_none()) return nullptr;
  ClassInfoObject* info = InstanceOf<ClassInfoObject>(object);
  if (info == nullptr) ThrowExpected("CNodeClassInfo", object);
  return info->info;
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

// ---- argument records ----

struct ArgInfoObject {
  nb::object name = nb::none();
  nb::object value = nb::none();
  nb::object prefix = nb::none();
  nb::object type_expr = nb::none();
};

struct AsNameObject {
  nb::object module_name = nb::none();
  nb::object as_name = nb::none();
};

// A host's node may hold the record that it stands in.
int TraverseArg(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (!nb::inst_ready(self)) return 0;
  const ArgInfoObject& object = *nb::inst_ptr<ArgInfoObject>(self);
  Py_VISIT(object.name.ptr());
  Py_VISIT(object.value.ptr());
  Py_VISIT(object.prefix.ptr());
  Py_VISIT(object.type_expr.ptr());
  return 0;
}

int ClearArg(PyObject* self) {
  if (nb::inst_ready(self)) const ArgInfoObject gone = std::exchange(*nb::inst_ptr<ArgInfoObject>(self), {});
  return 0;
}

const PyType_Slot kArgSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseArg)},
                                 {Py_tp_clear, reinterpret_cast<void*>(ClearArg)},
                                 {0, nullptr}};

void BindRecords(nb::module_& m) {
  nb::class_<ArgInfoObject> arg(m, "CArgInfo", nb::type_slots(kArgSlots),
                                "One parameter of a definition, or one argument of a call.");
  arg.def(nb::init<>());
  const auto node_field = [&](const char* name, nb::object ArgInfoObject::*field) {
    arg.def_prop_rw(
        name, [field](ArgInfoObject& self) { return self.*field; },
        [field](ArgInfoObject& self, Any value) {
          if (!value.is_none()) CheckedRef(value);
          self.*field = nb::borrow(value);
        },
        nb::arg("value"));
  };
  node_field("name", &ArgInfoObject::name);
  node_field("value", &ArgInfoObject::value);
  node_field("type_expr", &ArgInfoObject::type_expr);
  arg.def_prop_rw(
      "prefix", [](ArgInfoObject& self) { return self.prefix; },
      [](ArgInfoObject& self, Any value) {
        HostText::FromStr(value, true);
        self.prefix = nb::borrow(value);
      },
      nb::arg("value"));

  nb::class_<AsNameObject> as_name(m, "CAsName", "One imported name, as written and as bound.");
  as_name.def(nb::init<>());
  const auto text_field = [&](const char* name, nb::object AsNameObject::*field) {
    as_name.def_prop_rw(
        name, [field](AsNameObject& self) { return self.*field; },
        [field](AsNameObject& self, Any value) {
          HostText::FromStr(value, true);
          self.*field = nb::borrow(value);
        },
        nb::arg("value"));
  };
  text_field("module_name", &AsNameObject::module_name);
  text_field("as_name", &AsNameObject::as_name);
}

// ---- the factory ----

std::unordered_map<std::string, int> NumbersByText(nb::handle mapping) {
  std::unordered_map<std::string, int> numbers;
  nb::object items = nb::steal(PyMapping_Items(mapping.ptr()));
  if (!items.is_valid()) throw nb::python_error();
  for (nb::handle item : items) numbers[std::string(HostText::FromStr(item[0]).text())] = Int32Of(nb::object(item[1]));
  return numbers;
}

KeywordSet KeywordsOf(nb::handle keywords) {
  KeywordSet set;
  const int truth = PyObject_IsTrue(keywords.ptr());
  if (truth < 0) throw nb::python_error();
  if (truth == 0) return set;
  if (!PyDict_Check(keywords.ptr())) ThrowExpected("dict", keywords);
  set.enabled = true;
  set.host_lookup = [dict = nb::borrow(keywords)](Text text) {
    return CallingHost([&] {
      const int found = PyDict_Contains(dict.ptr(), StrOf(text).ptr());
      if (found < 0) throw nb::python_error();
      return found != 0;
    });
  };
  return set;
}

void InitFactory(nb::pointer_and_handle<FactoryObject> self, Any gram, Any cls_for_nodetype, Any keywords,
                 Any tok_number2name, Any op_text2number) {
  std::unordered_map<std::string, int> operators = NumbersByText(op_text2number);
  nb::object symbol_get = gram.attr("number2symbol").attr("get");
  nb::object token_get = tok_number2name.attr("get");
  nb::object classes = TupleOf(cls_for_nodetype);
  const size_t count = static_cast<size_t>(PyTuple_GET_SIZE(classes.ptr()));
  std::vector<CNodeFactory::State> states;
  std::vector<HostText> names(count);
  for (size_t number = 0; number < count; ++number) {
    nb::object name = symbol_get(number);
    if (name.is_none()) name = token_get(number);
    names[number] = HostText::FromStr(name, true);
    states.push_back({KindOfClass(PyTuple_GET_ITEM(classes.ptr(), number)), names[number].text()});
  }
  Ref<HostPool> pool(new HostPool);
  auto factory =
      std::make_shared<CNodeFactory>(Ref<NodePool>(pool.get()), states, KeywordsOf(keywords), std::move(operators));
  for (size_t number = 0; number < count; ++number) {
    nb::handle cls = PyTuple_GET_ITEM(classes.ptr(), number);
    if (!cls.is(ClassOfKind(states[number].kind))) pool->classes.emplace(factory->class_info(number), nb::borrow(cls));
  }
  nb::object kept = factory->keywords().enabled ? nb::borrow(keywords) : nb::object(nb::dict());
  new (self.p) FactoryObject{std::move(factory), std::move(kept), {}, {}};
}

nb::object ClassInfos(FactoryObject& self) {
  if (!self.class_infos.is_valid()) {
    nb::list list;
    for (size_t i = 0; i < self.factory->state_count(); ++i) list.append(WrapClassInfo(self.factory->class_info(i)));
    self.class_infos = list;
  }
  return self.class_infos;
}

nb::object OperatorNumbers(FactoryObject& self) {
  if (!self.op_text2number.is_valid()) {
    nb::dict dict;
    for (const auto& [text, number] : self.factory->op_text2number()) dict[StrOf(text)] = number;
    self.op_text2number = dict;
  }
  return self.op_text2number;
}

// Text of the host's for a node that it makes: kept by the pool.
Text NodeText(NodePool& pool, nb::handle text) {
  if (!text.is_none() && !PyUnicode_Check(text.ptr())) ThrowError(ErrorKind::kAssertionError, "");
  return pool.Intern(HostText::FromStr(text, true).text());
}

// Makes a node with a context of the host's, which belongs to the node afterwards, and is let go of
// where there is none.
template <class Make>
CNode* WithContext(NodePool& pool, nb::handle context, Make&& make) {
  const Context owned = CoreContext(context, &pool);
  try {
    return make(owned);
  } catch (...) {
    pool.ReleaseContext(owned);
    throw;
  }
}

// ConvertSingleNode of the factory with text and context of the host's.
CNode* ConvertNode(CNodeFactory& factory, int32_t type, nb::handle text, nb::handle context, CNode* const* children,
                   uint32_t child_count) {
  if (!text.is_none() && !PyUnicode_Check(text.ptr())) {
    // What fails before the text is looked at.
    Assert(children == nullptr || child_count >= 2, "");
    if (type != tok::AWAIT && type != tok::ASYNC) factory.RecordForState(type);
  }
  const Text node_text = NodeText(factory.pool(), text);
  return WithContext(factory.pool(), context, [&](Context owned) {
    return factory.ConvertSingleNode(type, node_text, owned, children, child_count);
  });
}

// Children of the host's list, which becomes the node's.
struct HostChildren {
  std::vector<CNode*> nodes;
  bool has_list = false;

  explicit HostChildren(nb::handle list) {
    if (list.is_none()) return;
    if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
    has_list = true;
    nodes = NodesOf(list, NodeKind::kCNode, true);
  }
  // Not null for an empty list, which is not the same as none.
  CNode* const* data() {
    static CNode* const none[1] = {nullptr};
    if (!has_list) return nullptr;
    return nodes.empty() ? none : nodes.data();
  }
  uint32_t count() const { return static_cast<uint32_t>(nodes.size()); }
};

// A node that was made from the host's list of children keeps that list.
nb::object WrapWithChildren(CNode* node, nb::handle children) {
  nb::object wrapper = Wrap(node, {});
  if (!children.is_none()) CheckedRef(wrapper).SetChildren(children);
  return wrapper;
}

nb::object NewNode(FactoryObject& self, Any cls_info, Any nodetype, Any text, Any context, Any children) {
  Int32Of(nodetype);
  CNodeClassInfo* info = InfoOrNull(cls_info);
  const Text node_text = NodeText(info == nullptr ? self.factory->pool() : *info->pool, text);
  if (info == nullptr) ThrowNoAttribute("fFirstFree");
  HostChildren nodes(children);
  CNode* node = WithContext(*info->pool, context, [&](Context owned) {
    return self.factory->NewNode(info, node_text, owned, nodes.data(), nodes.count());
  });
  return WrapWithChildren(node, children);
}

// A number among the items may be an object of the host's whose conversion changes any list, so
// what is read here is held.
CNode* ConvertRaw(CNodeFactory& factory, nb::object raw_node) {
  if (!PyTuple_Check(raw_node.ptr())) ThrowExpected("tuple", raw_node);
  const Py_ssize_t size = PyTuple_GET_SIZE(raw_node.ptr());
  if (size != 4) {
    if (size > 4) {
      PyErr_Format(PyExc_ValueError, "too many values to unpack (expected %zd)", Py_ssize_t{4});
    } else {
      PyErr_Format(PyExc_ValueError, "need more than %zd value%.1s to unpack", size, size == 1 ? "" : "s");
    }
    throw nb::python_error();
  }
  const auto item = [&](Py_ssize_t i) { return nb::handle(PyTuple_GET_ITEM(raw_node.ptr(), i)); };
  const int32_t type = Int32Of(item(0));
  nb::handle children = item(3);
  std::vector<CNode*> converted;
  if (!children.is_none()) {
    if (!PyList_Check(children.ptr())) ThrowExpected("list", children);
    if (Py_EnterRecursiveCall(" in RecursiveConvert")) throw nb::python_error();
    try {
      for (Py_ssize_t i = 0; i < PyList_GET_SIZE(children.ptr()); ++i)
        converted.push_back(ConvertRaw(factory, nb::borrow(PyList_GET_ITEM(children.ptr(), i))));
      Py_LeaveRecursiveCall();
    } catch (...) {
      Py_LeaveRecursiveCall();
      for (CNode* node : converted) factory.pool().Reclaim(node);
      throw;
    }
  }
  try {
    static CNode* const none[1] = {nullptr};
    CNode* const* data = children.is_none() ? nullptr : converted.empty() ? none : converted.data();
    return ConvertNode(factory, type, item(1), item(2), data, static_cast<uint32_t>(converted.size()));
  } catch (...) {
    for (CNode* node : converted) factory.pool().Reclaim(node);
    throw;
  }
}

void BindFactory(nb::module_& m) {
  nb::class_<ClassInfoObject> info(m, "CNodeClassInfo",
                                   "The record of one parser state; it heads that state's free list.");
  info.def("__init__", &InitClassInfo, nb::arg("cls"), nb::arg("nodetype"), nb::arg("name"));
  info.def_prop_ro("fCls", [](ClassInfoObject& self) { return nb::borrow(ClassOfInfo(self.info)); });
  info.def_prop_ro("fNodeType", [](ClassInfoObject& self) { return self.info->fNodeType; });
  info.def_prop_ro("fName", [](ClassInfoObject& self) { return StrOf(self.info->fName); });
  info.def_prop_ro("fFirstFree", [](ClassInfoObject& self) { return WrapNeighbour(self.info->fFirstFree); });

  nb::class_<FactoryObject> cls(m, "CNodeFactory", "Makes nodes from what a parser reduces, and takes them back.");
  cls.def("__init__", &InitFactory, nb::arg("gram"), nb::arg("cls_for_nodetype"), nb::arg("keywords"),
          nb::arg("tok_number2name"), nb::arg("op_text2number"));
  cls.def_prop_ro("_fClassInfoList", &ClassInfos);
  cls.def_prop_ro("_fKeywordClassInfo",
                  [](FactoryObject& self) { return WrapClassInfo(self.factory->keyword_class_info()); });
  cls.def_prop_ro("_fKeywords", [](FactoryObject& self) { return self.keywords; });
  cls.def_prop_ro("_fOperatorStrToNumber", &OperatorNumbers);
  DefOperation(
      cls, "ConvertSingleNode",
      [](FactoryObject& self, Any nodetype, Any text, Any context, Any children) {
        return ConvertSingleNode(*self.factory, nodetype, text, context, children);
      },
      nb::arg("nodetype"), nb::arg("text"), nb::arg("context"), nb::arg("children"),
      "The node for a reduced rule or a token: a new one, or the statement of a statement and its line end.");
  DefOperation(cls, "NewNode", &NewNode, nb::arg("cls_info"), nb::arg("nodetype"), nb::arg("text"), nb::arg("context"),
               nb::arg("children"), "A node of the record's class, off its free list.");
  DefOperation(
      cls, "NewKeywordNode",
      [](FactoryObject& self, Any text, Any context) {
        const Text node_text = NodeText(self.factory->pool(), text);
        return Wrap(WithContext(self.factory->pool(), context,
                                [&](Context owned) { return self.factory->NewKeywordNode(node_text, owned); }),
                    {});
      },
      nb::arg("text"), nb::arg("context"));
  DefOperation(
      cls, "NewNameNode",
      [](FactoryObject& self, Any text, Any context) {
        const Text node_text = NodeText(self.factory->pool(), text);
        return Wrap(WithContext(self.factory->pool(), context,
                                [&](Context owned) { return self.factory->NewNameNode(node_text, owned); }),
                    {});
      },
      nb::arg("text"), nb::arg("context"));
  DefOperation(
      cls, "CreateOperatorNode",
      [](FactoryObject& self, Any op_str, Any context) {
        NodePool& pool = self.factory->pool();
        const HostText text = HostText::FromStr(op_str, true);
        if (IsNone(text.text()) || !self.factory->op_text2number().contains(std::string(text.text())))
          return nb::object(nb::none());
        const Text op = pool.Intern(text.text());
        return Wrap(
            WithContext(pool, context, [&](Context owned) { return self.factory->CreateOperatorNode(op, owned); }), {});
      },
      nb::arg("op_str"), nb::arg("context"), "An operator's leaf, or None for text that is no operator.");
  DefOperation(
      cls, "DiscardNodes", [](FactoryObject& self, Any node) { self.factory->DiscardNodes(NodeOrNull(node)); },
      nb::arg("node"), "Gives a whole tree back to the free lists.");
  DefOperation(
      cls, "RecursiveConvert",
      [](FactoryObject& self, Any raw_node) { return Wrap(RecursiveConvert(*self.factory, raw_node), {}); },
      nb::arg("raw_node"), "The tree of a raw node (type, value, context, children).");

  DefOperation(
      m, "__FinishedWithNode", [](Any node, Any depth) { FinishedWithNodeAtDepth(NodeOrNull(node), Int64Of(depth)); },
      nb::arg("node"), nb::arg("depth"));
  const auto finished = [](Any node) { FinishedWithNode(NodeOrNull(node)); };
  DefOperation(m, "FinishedWithNode", finished, nb::arg("node"),
               "Gives a whole tree back for reuse. Each tree goes back once.");
  DefOperation(m, "NotCompiledFinishedWithNode", finished, nb::arg("node"),
               "FinishedWithNode, for callers in host-level code.");
}

}  // namespace

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

nb::object WrapArg(const CArgInfo& arg, const Ref<SourceText>& source) {
  ArgInfoObject object;
  object.name = Wrap(arg.name, source);
  object.value = Wrap(arg.value, source);
  object.prefix = StrOf(arg.prefix);
  object.type_expr = Wrap(arg.type_expr, source);
  return nb::cast(std::move(object));
}

nb::object WrapUsedArgs(const UsedArgList& args, const Ref<SourceText>& source) {
  nb::list list;
  for (const CArgInfo& arg : args) list.append(WrapArg(arg, source));
  return list;
}

nb::object WrapArgList(const ArgList& args, const Ref<SourceText>& source) {
  if (Py_EnterRecursiveCall(" in a list of nested parameters")) throw nb::python_error();
  nb::list list;
  try {
    for (const ArgEntry& entry : args)
      list.append(entry.is_list ? WrapArgList(entry.list, source) : WrapArg(entry.arg, source));
  } catch (...) {
    Py_LeaveRecursiveCall();
    throw;
  }
  Py_LeaveRecursiveCall();
  return list;
}

nb::object WrapAsName(const CAsName& name) {
  AsNameObject object;
  object.module_name = StrOf(name.module_name);
  if (name.has_as_name) object.as_name = StrOf(name.as_name);
  return nb::cast(std::move(object));
}

CArgInfo ArgOf(nb::handle object) {
  ArgInfoObject* arg = InstanceOf<ArgInfoObject>(object);
  if (arg == nullptr) ThrowExpected("CArgInfo", object);
  CArgInfo result;
  result.name = NodeOrNull(arg->name);
  result.value = NodeOrNull(arg->value);
  result.type_expr = NodeOrNull(arg->type_expr);
  const HostText prefix = HostText::FromStr(arg->prefix, true);
  if (prefix.text() == "*") result.prefix = "*";
  if (prefix.text() == "**") result.prefix = "**";
  return result;
}

UsedArgList UsedArgsOf(nb::handle list) {
  if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
  UsedArgList args;
  for (nb::handle item : list) args.push_back(ArgOf(item));
  return args;
}

ArgList ArgListOf(nb::handle list) {
  if (!PyList_Check(list.ptr())) ThrowExpected("list", list);
  if (Py_EnterRecursiveCall(" in a list of nested parameters")) throw nb::python_error();
  ArgList args;
  try {
    for (nb::handle item : list) {
      if (PyList_Check(item.ptr())) {
        args.emplace_back(ArgListOf(item));
      } else {
        args.emplace_back(ArgOf(item));
      }
    }
  } catch (...) {
    Py_LeaveRecursiveCall();
    throw;
  }
  Py_LeaveRecursiveCall();
  return args;
}

nb::object NewFactoryObject(std::shared_ptr<CNodeFactory> factory, nb::object keywords) {
  return nb::cast(FactoryObject{std::move(factory), std::move(keywords), {}, {}});
}

CNode* RecursiveConvert(CNodeFactory& factory, nb::handle raw_node) {
  return ConvertRaw(factory, nb::borrow(raw_node));
}

nb::object ConvertSingleNode(CNodeFactory& factory, nb::handle nodetype, nb::handle text, nb::handle context,
                             nb::handle children) {
  const int32_t type = Int32Of(nodetype);
  HostChildren nodes(children);
  CNode* node = ConvertNode(factory, type, text, context, nodes.data(), nodes.count());
  if (nodes.has_list && node == nodes.nodes[0]) {
    // The rule and its line end are gone; what is left of the host's list is the statement.
    if (PyList_SetSlice(children.ptr(), 1, 2, nullptr) < 0) throw nb::python_error();
    return Wrap(node, {});
  }
  return WrapWithChildren(node, children);
}

void BindTree(nb::module_& tarvex) {
  BindNodeClasses(tarvex);
  BindFactory(tarvex);
  BindRecords(tarvex);
}

}  // namespace quillet::host
