// CDispatchWalker, over a dict of the host's callables.
#include <utility>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/hints_object.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "bindings/node_ref.h"
#include "hints/hint_walker.h"

namespace quillet::host {
namespace {

nb::object& DispatchDict(DispatchObject& object) {
  if (!object.dispatch_dict.is_valid()) {
    nb::handle cls = nb::type<HintWalkerObject>();
    nb::dict dict;
    dict[ClassOfKind(NodeKind::kCFuncdefStmt)] = cls.attr("_VisitFuncdefStmt");
    dict[ClassOfKind(NodeKind::kCExprStmt)] = cls.attr("_VisitExprStmt");
    dict[ClassOfKind(NodeKind::kCForStmt)] = cls.attr("_VisitForStmt");
    dict[ClassOfKind(NodeKind::kCWithStmt)] = cls.attr("_VisitWithStmt");
    dict[ClassOfKind(NodeKind::kCNameLiteral)] = nb::handle(Py_False);
    object.dispatch_dict = dict;
  }
  return object.dispatch_dict;
}

// What the host's dict says of a node: whether its children are to be walked.
bool VisitByDict(DispatchObject& object, nb::handle self, const Ref<SourceText>& source, CNode* node) {
  nb::handle cls = node == nullptr ? nb::handle((PyObject*)Py_TYPE(Py_None)) : ClassOfNode(node);
  nb::object& dict = DispatchDict(object);
  if (dict.is_none()) {
    PyErr_SetString(PyExc_AttributeError, "'NoneType' object has no attribute 'get'");
    throw nb::python_error();
  }
  nb::object visit = nb::borrow(PyDict_GetItemWithError(dict.ptr(), cls.ptr()));
  if (!visit.is_valid()) {
    if (PyErr_Occurred()) throw nb::python_error();
    return true;
  }
  if (visit.ptr() == Py_False) return false;
  if (visit.is_none()) return true;
  nb::object result = visit(self, Wrap(node, source));
  // The host may have changed the children of the node.
  if (node != nullptr) RefOrNull(Wrap(node, source));
  const int truth = PyObject_IsTrue(result.ptr());
  if (truth < 0) throw nb::python_error();
  return truth != 0;
}

// Lets a walk of the host's go by its dict while it lives. A visit may begin the next, of nodes of
// another source, in the middle of this one.
class DictVisits final : public CDispatchWalker::HostVisits {
 public:
  DictVisits(DispatchObject& object, nb::handle self, Ref<SourceText> source)
      : object_(object),
        self_(self),
        source_(std::move(source)),
        outer_(std::exchange(object.walker->host_visits, this)) {}
  ~DictVisits() { object_.walker->host_visits = outer_; }
  DictVisits(const DictVisits&) = delete;
  DictVisits& operator=(const DictVisits&) = delete;

  bool Visit(CNode* node) override {
    return CallingHost([&] { return VisitByDict(object_, self_, source_, node); });
  }

 private:
  DispatchObject& object_;
  nb::handle self_;
  Ref<SourceText> source_;
  CDispatchWalker::HostVisits* outer_;
};

template <int32_t CDispatchWalker::*Field>
void DefCount(nb::class_<DispatchObject>& cls, const char* name) {
  cls.def_prop_rw(
      name, [](DispatchObject& self) { return (*self.walker).*Field; },
      [](DispatchObject& self, Any value) { (*self.walker).*Field = Int32Of(value); });
}

void WalkByDict(nb::handle self, Any node, Any logical, Truth first_in_def) {
  auto& object = nb::cast<DispatchObject&>(self);
  NodeRef* root = RefOrNull(node);
  LineObject& line = LineOf(logical);
  RefuseSecondWalk(object);
  const OneThread use(object.walker->thread_use, kTheWalker);
  const WalkOfHost walk(object, logical);
  const Recording recording(&line);
  const DictVisits visits(object, self, SourceOf(root));
  // The operation of this class, also for a walker of a class that is derived from it.
  object.walker->CDispatchWalker::Walk(root == nullptr ? nullptr : root->node(), &line.line(), first_in_def);
}

}  // namespace

int TraverseDispatch(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (!nb::inst_ready(self)) return 0;
  auto& object = *nb::inst_ptr<DispatchObject>(self);
  Py_VISIT(object.dispatch_dict.ptr());
  Py_VISIT(object.handed_in.line.ptr());
  return 0;
}

int ClearDispatch(PyObject* self) {
  if (!nb::inst_ready(self)) return 0;
  auto& object = *nb::inst_ptr<DispatchObject>(self);
  if (object.handed_in.line.is_valid()) object.walker->fLogical = nullptr;
  object.handed_in.Replace({});
  nb::object dict = std::exchange(object.dispatch_dict, nb::none());
  return 0;
}

namespace {

const PyType_Slot kDispatchSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseDispatch)},
                                      {Py_tp_clear, reinterpret_cast<void*>(ClearDispatch)},
                                      {0, nullptr}};

}  // namespace

void BindDispatch(nb::module_& m) {
  nb::class_<DispatchObject> cls(m, "CDispatchWalker", nb::type_slots(kDispatchSlots),
                                 "Walks a tree by a dict from node class to visit.");
  cls.def(
      "__init__",
      [](DispatchObject* self, Any dispatch_dict) {
        if (!dispatch_dict.is_none() && !PyDict_Check(dispatch_dict.ptr())) ThrowExpected("dict", dispatch_dict);
        new (self)
            DispatchObject{std::make_shared<CDispatchWalker>(CDispatchWalker::Table{}), nb::borrow(dispatch_dict), {}};
      },
      nb::arg("dispatch_dict"));
  cls.def_prop_rw(
      "_fLogical", [](DispatchObject& self) { return HostLineOf(self.walker->fLogical, self.handed_in); },
      [](DispatchObject& self, Any value) {
        self.handed_in.HandIn(value, [&self](LogicalLine* line) { self.walker->fLogical = line; });
      },
      nb::arg("value"));
  cls.def_prop_ro("_fDispatchDict", [](DispatchObject& self) { return DispatchDict(self); });
  DefCount<&CDispatchWalker::fVisitCount>(cls, "_fVisitCount");
  DefCount<&CDispatchWalker::fRecurseCount>(cls, "_fRecurseCount");
  DefCount<&CDispatchWalker::fMaxVisits>(cls, "_fMaxVisits");
  DefCount<&CDispatchWalker::fMaxRecurseCount>(cls, "_fMaxRecurseCount");
  cls.def_prop_ro("_fNodeStack", [](DispatchObject& self) { return WrapList(self.walker->fNodeStack, {}); });
  DefOperation(cls, "Walk", &WalkByDict, nb::arg("node"), nb::arg("logical"), nb::arg("first_in_def"));
  DefOperation(
      cls, "_VisitNode",
      [](nb::handle self, Any node) {
        auto& object = nb::cast<DispatchObject&>(self);
        NodeRef* root = RefOrNull(node);
        const OneThread use(object.walker->thread_use, kTheWalker);
        const DictVisits visits(object, self, SourceOf(root));
        object.walker->VisitNode(root == nullptr ? nullptr : root->node());
      },
      nb::arg("node"));
}

}  // namespace quillet::host
