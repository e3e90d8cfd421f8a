// CNodeFactory, and the ways in which a tree goes back.
#include <string>
#include <unordered_map>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "tree/factory.h"

namespace quillet::host {
namespace {

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

}  // namespace

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

void BindFactory(nb::module_& m) {
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

}  // namespace quillet::host
