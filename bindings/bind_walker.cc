// CNodeWalker: the walk, and each of its operations by name.
#include <optional>
#include <type_traits>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "bindings/node_ref.h"
#include "bindings/walker_object.h"
#include "vocabulary/symbolinfo.h"
#include "walker/walker.h"

namespace quillet::host {
namespace {

constexpr const char* kTheWalker = "the walker";

// Around an operation that the host calls by name.
struct OperationByName {
  explicit OperationByName(WalkerObject& self)
      : use(self.walker->thread_use, kTheWalker), recording(self.walker->fLogical), under_way(*self.walker) {}
  OneThread use;
  Recording recording;
  CNodeWalker::Operation under_way;
};

// ---- operations on one node ----

template <auto Operation>
struct Visit;
template <class T, void (CNodeWalker::*Operation)(T*)>
struct Visit<Operation> {
  static void Call(WalkerObject& self, Any node) {
    NodeRef& ref = RefOf(node, NodeKindRange<T>::kFirst);
    const OperationByName operation(self);
    (self.walker.get()->*Operation)(static_cast<T*>(ref.node()));
  }
};

template <auto Operation>
void DefVisit(nb::class_<WalkerObject>& cls, const char* name) {
  DefOperation(cls, name, &Visit<Operation>::Call, nb::arg("node"));
}

Text TextArgument(nb::handle value, HostText& keep, bool none = true) {
  keep = HostText::FromStrOrBytes(value, none);
  return keep.text();
}

template <void (CNodeWalker::*Operation)(Text)>
void RecordName(WalkerObject& self, Any name) {
  HostText keep;
  const Text text = TextArgument(name, keep, false);
  const OperationByName operation(self);
  (self.walker.get()->*Operation)(text);
}

template <void (CNodeWalker::*Operation)(Text, Text)>
void RecordPair(WalkerObject& self, Any name, Any info) {
  HostText keep_name, keep_info;
  const Text name_text = TextArgument(name, keep_name, false);
  const Text info_text = TextArgument(info, keep_info, false);
  const OperationByName operation(self);
  (self.walker.get()->*Operation)(name_text, info_text);
}

template <void (CNodeWalker::*Process)(const ArgList&)>
void ProcessArgs(WalkerObject& self, Any arg_list) {
  const ArgList args = ArgListOf(arg_list);
  const OperationByName operation(self);
  (self.walker.get()->*Process)(args);
}

void BindFrame(nb::class_<WalkerObject>& cls) {
  DefOperation(
      cls, "Walk",
      [](WalkerObject& self, Any node, Any logical) {
        CNode* root = NodeOrNull(node);
        if (root == nullptr) return self.walker->Walk(nullptr, nullptr);
        LineObject& line = LineOf(logical);
        // A second walk is refused as such, whoever begins it.
        std::optional<OneThread> use;
        if (self.walker->fLogical == nullptr) use.emplace(self.walker->thread_use, kTheWalker);
        // Where the host hands in a line meanwhile, the end of the walk takes it back.
        struct AtEnd {
          WalkerObject& self;
          ~AtEnd() {
            if (self.walker->fLogical == nullptr) self.handed_in.Replace({});
          }
        } at_end{self};
        const Recording recording(&line);
        self.walker->Walk(root, &line.line());
      },
      nb::arg("node"), nb::arg("logical"), "Records on `logical` what the tree says of names.");
  DefVisit<&CNodeWalker::ProcessNamesFound>(cls, "_ProcessNamesFound");
  DefVisit<&CNodeWalker::VisitChildren>(cls, "_VisitChildren");
  DefVisit<&CNodeWalker::VisitNode>(cls, "_VisitNode");
  DefOperation(
      cls, "_RaiseIfNotInstance",
      [](WalkerObject&, Any node, Any cls_wanted) {
        const int is_instance = PyObject_IsInstance(node.ptr(), cls_wanted.ptr());
        if (is_instance < 0) throw nb::python_error();
        if (is_instance == 0) {
          nb::object message = nb::str("Node is not a {}: {}").format(nb::repr(cls_wanted), nb::repr(node));
          PyErr_SetObject(PyExc_ValueError, message.ptr());
          throw nb::python_error();
        }
      },
      nb::arg("node"), nb::arg("cls"));
}

void BindNames(nb::class_<WalkerObject>& cls) {
  DefOperation(
      cls, "_VisitStoreContextNode",
      [](WalkerObject& self, Any node, Truth within_sub_expr) {
        NodeRef& ref = RefOf(node);
        const OperationByName operation(self);
        self.walker->VisitStoreContextNode(ref.node(), within_sub_expr);
      },
      nb::arg("node"), nb::arg("within_sub_expr") = false);
  DefVisit<&CNodeWalker::VisitLoadContextNode>(cls, "_VisitLoadContextNode");
  DefVisit<&CNodeWalker::VisitCompForNode>(cls, "_VisitCompForNode");
  DefOperation(
      cls, "_VisitNameLiteral",
      [](WalkerObject& self, Any node, Any atom_node, Any all_trailers, Any trailer_i) {
        NodeRef& ref = RefOf(node);
        CNode* atom = NodeOrNull(atom_node);
        std::vector<CNode*> trailers;
        if (!all_trailers.is_none()) trailers = NodesOf(all_trailers, NodeKind::kCTrailer);
        const int64_t index = Int64Of(trailer_i);
        const OperationByName operation(self);
        self.walker->VisitNameLiteral(ref.node(), atom, trailers, index, !all_trailers.is_none());
      },
      nb::arg("node"), nb::arg("atom_node"), nb::arg("all_trailers"), nb::arg("trailer_i"));
  DefVisit<&CNodeWalker::VisitDottedName>(cls, "_VisitDottedName");
  DefOperation(cls, "_ProcessLoadName", &RecordName<&CNodeWalker::ProcessLoadName>, nb::arg("name"));
  DefVisit<&CNodeWalker::VisitPower>(cls, "_VisitPower");
  DefVisit<&CNodeWalker::VisitAtomExpr>(cls, "_VisitAtomExpr");
  DefOperation(
      cls, "_VisitAtomPlusTrailers",
      [](WalkerObject& self, Any atom_node, Any all_trailers) {
        NodeRef& atom = RefOf(atom_node);
        const std::vector<CNode*> trailers = NodesOf(all_trailers, NodeKind::kCTrailer);
        const OperationByName operation(self);
        self.walker->VisitAtomPlusTrailers(atom.node(), trailers);
      },
      nb::arg("atom_node"), nb::arg("all_trailers"));
}

void BindDefinitions(nb::class_<WalkerObject>& cls) {
  DefVisit<&CNodeWalker::VisitImportNames>(cls, "_VisitImportNames");
  DefVisit<&CNodeWalker::VisitFromImport>(cls, "_VisitFromImport");
  DefVisit<&CNodeWalker::VisitFuncdef>(cls, "_VisitFuncdef");
  DefVisit<&CNodeWalker::VisitParameters>(cls, "_VisitParameters");
  DefVisit<&CNodeWalker::VisitLambdaExpr>(cls, "_VisitLambdaExpr");
  DefVisit<&CNodeWalker::VisitClassdef>(cls, "_VisitClassdef");
  DefVisit<&CNodeWalker::VisitSingleDecorator>(cls, "_VisitSingleDecorator");
  DefVisit<&CNodeWalker::VisitGlobalStmt>(cls, "_VisitGlobalStmt");
  DefVisit<&CNodeWalker::VisitNonlocalStmt>(cls, "_VisitNonlocalStmt");
  DefOperation(cls, "_ProcessDefiningArgList", &ProcessArgs<&CNodeWalker::ProcessDefiningArgList>, nb::arg("arg_list"));
  DefOperation(cls, "_ProcessLambdaDefiningArgList", &ProcessArgs<&CNodeWalker::ProcessLambdaDefiningArgList>,
               nb::arg("arg_list"));
}

void BindStatements(nb::class_<WalkerObject>& cls) {
  DefVisit<&CNodeWalker::VisitExprStmt>(cls, "_VisitExprStmt");
  DefVisit<&CNodeWalker::VisitAssignment>(cls, "_VisitAssignment");
  DefVisit<&CNodeWalker::VisitAugAssign>(cls, "_VisitAugAssign");
  DefVisit<&CNodeWalker::VisitAnnotatedAssign>(cls, "_VisitAnnotatedAssign");
  DefVisit<&CNodeWalker::VisitForStmt>(cls, "_VisitForStmt");
  DefVisit<&CNodeWalker::VisitWithItem>(cls, "_VisitWithItem");
  DefVisit<&CNodeWalker::VisitExceptClause>(cls, "_VisitExceptClause");
  DefVisit<&CNodeWalker::VisitNamedExpr>(cls, "_VisitNamedExpr");
  DefVisit<&CNodeWalker::VisitReturn>(cls, "_VisitReturn");
  DefVisit<&CNodeWalker::VisitYield>(cls, "_VisitYield");
  DefVisit<&CNodeWalker::VisitMatchStmt>(cls, "_VisitMatchStmt");
  DefVisit<&CNodeWalker::VisitCaseStmt>(cls, "_VisitCaseStmt");
  DefVisit<&CNodeWalker::VisitPatternNode>(cls, "_VisitPatternNode");
  DefVisit<&CNodeWalker::VisitTypeParameter>(cls, "_VisitTypeParameter");
  DefOperation(
      cls, "_ProcessTargets",
      [](WalkerObject& self, Any lhs, Any rhs, Any extra_trailer) {
        NodeRef& target = RefOf(lhs);
        CNode* value = NodeOrNull(rhs);
        HostText keep;
        const Text trailer = TextArgument(extra_trailer, keep);
        const OperationByName operation(self);
        self.walker->ProcessTargets(target.node(), value, trailer);
      },
      nb::arg("lhs"), nb::arg("rhs"), nb::arg("extra_trailer") = nb::none());
  DefOperation(
      cls, "_VisitCall",
      [](WalkerObject& self, Any atom, Any prev_trailers, Any arglist) {
        NodeRef& atom_ref = RefOf(atom);
        const std::vector<CNode*> trailers = NodesOf(prev_trailers, NodeKind::kCTrailer);
        CNode* args = RefOf(arglist).node();
        const OperationByName operation(self);
        self.walker->VisitCall(atom_ref.node(), trailers, args);
      },
      nb::arg("atom"), nb::arg("prev_trailers"), nb::arg("arglist"));
  DefOperation(
      cls, "_ProcessFunctionCall",
      [](WalkerObject& self, Any func_name, Any arg_list) {
        HostText keep;
        const Text name = TextArgument(func_name, keep);
        const UsedArgList args = UsedArgsOf(arg_list);
        const OperationByName operation(self);
        self.walker->ProcessFunctionCall(name, args);
      },
      nb::arg("func_name"), nb::arg("arg_list"));
  DefOperation(
      cls, "_ProcessIsInstanceCall",
      [](WalkerObject& self, Any arg_list) {
        const UsedArgList args = UsedArgsOf(arg_list);
        const OperationByName operation(self);
        self.walker->ProcessIsInstanceCall(args);
      },
      nb::arg("arg_list"));
}

void BindEquivalents(nb::class_<WalkerObject>& cls) {
  DefOperation(
      cls, "_AppendEquivNode",
      [](WalkerObject& self, Any name_node, Any equiv_node, Any extra_trailer) {
        NodeRef& name = RefOf(name_node);
        CNode* equiv = NodeOrNull(equiv_node);
        HostText keep;
        const Text trailer = TextArgument(extra_trailer, keep);
        const OperationByName operation(self);
        self.walker->AppendEquivNode(name.node(), equiv, trailer);
      },
      nb::arg("name_node"), nb::arg("equiv_node"), nb::arg("extra_trailer") = nb::none());
  DefOperation(
      cls, "_AppendSubscriptedEquivNode",
      [](WalkerObject& self, Any name_node, Any equiv_node, Any subscript) {
        NodeRef& name = RefOf(name_node);
        CNode* equiv = NodeOrNull(equiv_node);
        const int64_t index = Int64Of(subscript);
        const OperationByName operation(self);
        self.walker->AppendSubscriptedEquivNode(name.node(), equiv, index);
      },
      nb::arg("name_node"), nb::arg("equiv_node"), nb::arg("subscript"));
  DefOperation(
      cls, "_AddNodeInfoStr",
      [](WalkerObject& self, Any name_node, Any istr) {
        NodeRef& name = RefOf(name_node);
        HostText keep;
        const Text text = TextArgument(istr, keep, false);
        const OperationByName operation(self);
        self.walker->AddNodeInfoStr(name.node(), text);
      },
      nb::arg("name_node"), nb::arg("istr"));
  DefOperation(
      cls, "_TypeEquivForNode",
      [](WalkerObject& self, Any node, Any extra_trailer) {
        CNode* root = RefOf(node).node();
        HostText keep;
        return BytesOf(self.walker->TypeEquivForNode(root, TextArgument(extra_trailer, keep)));
      },
      nb::arg("node"), nb::arg("extra_trailer") = nb::none());
  DefOperation(
      cls, "_TypeEquivForOperatorExpression",
      [](WalkerObject& self, Any node) {
        CNode* root = RefOf(node, NodeKind::kCOperatorExpression).node();
        return BytesOf(self.walker->TypeEquivForOperatorExpression(static_cast<COperatorExpression*>(root)));
      },
      nb::arg("node"));
  DefOperation(cls, "_AddTypeEquiv", &RecordPair<&CNodeWalker::AddTypeEquiv>, nb::arg("name"), nb::arg("equiv"));
  DefOperation(cls, "_AddArgInfoBytes", &RecordPair<&CNodeWalker::AddArgInfoBytes>, nb::arg("name"), nb::arg("ibytes"));
  DefOperation(cls, "_AddNameDefined", &RecordName<&CNodeWalker::AddNameDefined>, nb::arg("name"));
  DefOperation(cls, "_AddArgNameDefined", &RecordName<&CNodeWalker::AddArgNameDefined>, nb::arg("name"));
}

int TraverseWalker(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (!nb::inst_ready(self)) return 0;
  Py_VISIT(nb::inst_ptr<WalkerObject>(self)->handed_in.line.ptr());
  return 0;
}

int ClearWalker(PyObject* self) {
  if (!nb::inst_ready(self)) return 0;
  auto& object = *nb::inst_ptr<WalkerObject>(self);
  if (object.handed_in.line.is_valid()) object.walker->SetLogical(nullptr);
  object.handed_in.Replace({});
  return 0;
}

const PyType_Slot kWalkerSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseWalker)},
                                    {Py_tp_clear, reinterpret_cast<void*>(ClearWalker)},
                                    {0, nullptr}};

template <class Value, Value CNodeWalker::*Field>
void DefFlag(nb::class_<WalkerObject>& cls, const char* name) {
  if constexpr (std::is_same_v<Value, bool>) {
    cls.def_prop_rw(
        name, [](WalkerObject& self) { return (*self.walker).*Field; },
        [](WalkerObject& self, Truth value) { (*self.walker).*Field = value; });
  } else {
    cls.def_prop_rw(
        name, [](WalkerObject& self) { return (*self.walker).*Field; },
        [](WalkerObject& self, Any value) {
          if constexpr (sizeof(Value) == 4) {
            (*self.walker).*Field = Int32Of(value);
          } else {
            (*self.walker).*Field = Int64Of(value);
          }
        });
  }
}

nb::object LoadedNames(WalkerObject& self) {
  const WithoutCollector all_at_once;
  nb::dict names;
  const NameSet& loaded = self.walker->fLoadedNames;
  for (size_t i = 0; i < loaded.size(); ++i) names[StrOf(loaded[i])] = "";
  return names;
}

// The stores of a name as info texts joined by ";".
nb::object StoredNames(WalkerObject& self) {
  const WithoutCollector all_at_once;
  const StoreList& stores = self.walker->fStoredNames;
  nb::dict names;
  for (size_t i = 0; i < stores.size(); ++i) {
    std::string infos;
    for (const StoreList::Store* store = &stores.first(i);; store = &stores.at(store->next)) {
      if (!infos.empty()) infos += ';';
      infos += kWithinExprPrefix;
      infos += std::to_string(store->place);
      if (store->next == StoreList::kEnd) break;
    }
    names[StrOf(stores.name(i))] = StrOf(infos);
  }
  return names;
}

void BindFields(nb::class_<WalkerObject>& cls) {
  cls.def_prop_rw(
      "_fLogical", [](WalkerObject& self) { return HostLineOf(self.walker->fLogical, self.handed_in); },
      [](WalkerObject& self, Any value) {
        self.handed_in.HandIn(value, [&self](LogicalLine* line) { self.walker->SetLogical(line); });
      },
      nb::arg("value"));
  DefFlag<bool, &CNodeWalker::fLoadNameContext>(cls, "_fLoadNameContext");
  DefFlag<bool, &CNodeWalker::fStoreWithinSubExpr>(cls, "_fStoreWithinSubExpr");
  cls.def_prop_ro("_fLoadedNames", &LoadedNames);
  cls.def_prop_ro("_fStoredNames", &StoredNames);
  DefFlag<int32_t, &CNodeWalker::fVisitCount>(cls, "_fVisitCount");
  DefFlag<int32_t, &CNodeWalker::fRecurseCount>(cls, "_fRecurseCount");
  DefFlag<int32_t, &CNodeWalker::fMaxVisits>(cls, "_fMaxVisits");
  DefFlag<int32_t, &CNodeWalker::fMaxRecurseCount>(cls, "_fMaxRecurseCount");
  cls.def_prop_ro("_fToText", [](WalkerObject& self) {
    if (!self.to_text.is_valid())
      self.to_text = NewConverterObject(std::shared_ptr<CNodeToTextConverter>(self.walker, &self.walker->fToText));
    return self.to_text;
  });
  DefFlag<bool, &CNodeWalker::fIncludeExprText>(cls, "_fIncludeExprText");
  DefFlag<bool, &CNodeWalker::fIncludeOperatorExpressions>(cls, "_fIncludeOperatorExpressions");
  DefFlag<int64_t, &CNodeWalker::fMaxOperatorExpressionLength>(cls, "_fMaxOperatorExpressionLength");
  DefFlag<bool, &CNodeWalker::fPy3>(cls, "_fPy3");
}

}  // namespace

nb::object NewWalkerObject(std::shared_ptr<CNodeWalker> walker) {
  return nb::cast(WalkerObject{std::move(walker), {}, {}});
}

nb::object HostLineOf(LogicalLine* line, const HandedInLine& handed_in) {
  if (line == nullptr) return nb::none();
  if (handed_in.line.is_valid() && &LineOf(handed_in.line).line() == line) return handed_in.line;
  auto* object = dynamic_cast<LineObject*>(line->hooks);
  return object == nullptr ? nb::object(nb::none()) : nb::borrow(object->self());
}

void BindWalker(nb::module_& tarvex) {
  nb::class_<WalkerObject> cls(tarvex, "CNodeWalker", nb::type_slots(kWalkerSlots),
                               "Turns a statement's tree into records on its logical line.");
  cls.def(
      "__init__",
      [](WalkerObject* self, Any version_triple) {
        const Version version = VersionOf(version_triple);
        new (self) WalkerObject{std::make_shared<CNodeWalker>(version), {}, {}};
      },
      nb::arg("version_triple"));
  BindFields(cls);
  BindFrame(cls);
  BindNames(cls);
  BindDefinitions(cls);
  BindStatements(cls);
  BindEquivalents(cls);
}

}  // namespace quillet::host
