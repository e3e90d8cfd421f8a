// CTypeHintWalker.
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/hints_object.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "bindings/node_ref.h"
#include "bindings/parser_object.h"
#include "bindings/walker_object.h"
#include "hints/hint_walker.h"

namespace quillet::host {
namespace {

// Around an operation that the host calls by name.
struct HintOperation {
  explicit HintOperation(HintWalkerObject& self)
      : use(self.walker->thread_use, kTheWalker), recording(self.walker->fLogical) {}
  OneThread use;
  Recording recording;
};

using HintClass = nb::class_<HintWalkerObject, DispatchObject>;

void InitHintWalker(HintWalkerObject* self, Any version_triple, Any grammar_file, Any general_node_walker) {
  new (self) HintWalkerObject();
  try {
    CPGenParserImpl::Options options;
    options.version = VersionOf(version_triple);
    options.grammar_file = ResolveGrammarFile(grammar_file);
    nb::object keywords;
    options.keywords = KeywordList(nb::none(), keywords);
    CNodeWalker* general = nullptr;
    if (!general_node_walker.is_none()) {
      WalkerObject* walker = InstanceOf<WalkerObject>(general_node_walker);
      if (walker == nullptr) ThrowExpected("CNodeWalker", general_node_walker);
      general = walker->walker.get();
    }
    self->walker =
        std::make_shared<CTypeHintWalker>(std::make_unique<CPGenParserImpl>(options), options.version, general);
    self->general_node_walker = nb::borrow(general_node_walker);
    self->version_triple = nb::borrow(version_triple);
  } catch (...) {
    self->~HintWalkerObject();
    throw;
  }
}

// The trees of hints have texts that stand with the records of the line being walked.
nb::object WrapHintTree(HintWalkerObject& self, CNode* node) {
  nb::object wrapper = Wrap(node, {});
  RehomeTexts(self.hints().hint_parser().factory().pool());
  return wrapper;
}

template <class Statement, bool (CTypeHintWalker::*Operation)(CNode*)>
bool VisitStatement(HintWalkerObject& self, Any node) {
  CNode* root = RefOf(node, NodeKindRange<Statement>::kFirst).node();
  const HintOperation operation(self);
  return (self.hints().*Operation)(root);
}

nb::object TextAndIndex(nb::object text, int32_t tok_i) { return nb::make_tuple(std::move(text), tok_i); }

void BindHintComments(HintClass& cls) {
  DefOperation(
      cls, "_FindEndingTypeComment",
      [](HintWalkerObject& self, Any node) {
        const CTypeHintWalker::Hint hint = self.hints().FindEndingTypeComment(RefOf(node).node());
        return TextAndIndex(hint.found ? StrOf(hint.text) : nb::object(nb::none()), hint.tok_i);
      },
      nb::arg("node"));
  DefOperation(
      cls, "_GetHintFromComment",
      [](HintWalkerObject&, Any comment) {
        const HostText text = HostText::FromStr(comment);
        std::string hint;
        return CTypeHintWalker::GetHintFromComment(text.text(), hint) ? StrOf(hint) : nb::object(nb::none());
      },
      nb::arg("comment"));
  DefOperation(
      cls, "_GetRowRange",
      [](HintWalkerObject& self, Any node) {
        const auto [first, end] = self.hints().GetRowRange(RefOf(node).node());
        return nb::make_tuple(first, end);
      },
      nb::arg("node"));
  DefOperation(
      cls, "_FindComment",
      [](HintWalkerObject& self, Any row, Any logical) {
        LogicalLine* line = logical.is_none() ? nullptr : &LineOf(logical).line();
        const CTypeHintWalker::Comment comment = self.hints().FindComment(Int64Of(row), line);
        return TextAndIndex(StrOf(comment.text), comment.tok_i);
      },
      nb::arg("row"), nb::arg("logical") = nb::none());
  DefOperation(
      cls, "_IsDottedName",
      [](HintWalkerObject&, Any text) { return CTypeHintWalker::IsDottedName(HostText::FromStr(text).text()); },
      nb::arg("text"));
  DefOperation(
      cls, "_ParseHint",
      [](HintWalkerObject& self, Any hint, Any tok_i, Truth call_general_node_walker) {
        const HostText text = HostText::FromStr(hint);
        const int32_t index = Int32Of(tok_i);
        const HintOperation operation(self);
        return WrapHintTree(self, self.hints().ParseHint(text.text(), index, call_general_node_walker));
      },
      nb::arg("hint"), nb::arg("tok_i"), nb::arg("call_general_node_walker"));
  DefOperation(
      cls, "_RaiseHintSyntaxError",
      [](HintWalkerObject& self, Any tok_i, Any offset) {
        self.hints().RaiseHintSyntaxError(Int32Of(tok_i), Int64Of(offset));
      },
      nb::arg("tok_i"), nb::arg("utf8_offset_in_hint"));
}

void BindHintStatements(HintClass& cls) {
  DefOperation(cls, "_VisitExprStmt", &VisitStatement<CExprStmt, &CTypeHintWalker::VisitExprStmt>, nb::arg("node"));
  DefOperation(cls, "_VisitForStmt", &VisitStatement<CForStmt, &CTypeHintWalker::VisitForStmt>, nb::arg("node"));
  DefOperation(cls, "_VisitWithStmt", &VisitStatement<CWithStmt, &CTypeHintWalker::VisitWithStmt>, nb::arg("node"));
  DefOperation(
      cls, "_VisitFuncdefStmt",
      [](HintWalkerObject& self, Any node) {
        VisitStatement<CFuncdefStmt, &CTypeHintWalker::VisitFuncdefStmt>(self, node);
      },
      nb::arg("node"));
  DefOperation(
      cls, "_ProcessTarget",
      [](HintWalkerObject& self, Any node, Any target) {
        CNode* statement = RefOf(node).node();
        CNode* target_node = NodeOrNull(target, NodeKind::kCExpression);
        const HintOperation operation(self);
        self.hints().ProcessTarget(statement, target_node);
      },
      nb::arg("node"), nb::arg("target"));
  DefOperation(
      cls, "_ProcessNameAndHintNodes",
      [](HintWalkerObject& self, Any name_node, Any hint_node, Truth is_arg) {
        CNode* name = NodeOrNull(name_node, NodeKind::kCExpression);
        CNode* hint = NodeOrNull(hint_node, NodeKind::kCExpression);
        const HintOperation operation(self);
        self.hints().ProcessNameAndHintNodes(name, hint, is_arg);
      },
      nb::arg("name_node"), nb::arg("hint_node"), nb::arg("is_arg"));
  DefOperation(
      cls, "_GetHintInfoStr",
      [](HintWalkerObject& self, Any node) {
        std::string info;
        return self.hints().GetHintInfoStr(NodeOrNull(node), info) ? BytesOf(info) : nb::object(nb::none());
      },
      nb::arg("node"));
  DefOperation(
      cls, "_AddSymInfo",
      [](HintWalkerObject& self, Any name, Any istr, Truth is_arg) {
        const HostText name_text = HostText::FromStrOrBytes(name);
        const HostText info_text = HostText::FromStrOrBytes(istr);
        const HintOperation operation(self);
        self.hints().AddSymInfo(name_text.text(), info_text.text(), is_arg);
      },
      nb::arg("name"), nb::arg("istr"), nb::arg("is_arg"));
}

void BindSignatures(HintClass& cls) {
  DefOperation(
      cls, "_RewriteFuncdefCommentHint",
      [](HintWalkerObject&, Any hint) {
        const HostText text = HostText::FromStr(hint);
        const CTypeHintWalker::RewrittenHint rewritten = CTypeHintWalker::RewriteFuncdefCommentHint(text.text());
        nb::list tokens, offsets;
        for (const std::string& token : rewritten.tokens) tokens.append(StrOf(token));
        for (int64_t offset : rewritten.utf8_offsets) offsets.append(offset);
        return nb::make_tuple(tokens, offsets);
      },
      nb::arg("hint"));
  DefOperation(
      cls, "_ProcessFuncdefComment",
      [](HintWalkerObject& self, Any hint, Any tok_i, Any funcdef_logical, Truth is_arg) {
        const HostText text = HostText::FromStr(hint);
        const int32_t index = Int32Of(tok_i);
        LogicalLine* line = funcdef_logical.is_none() ? nullptr : &LineOf(funcdef_logical).line();
        const HintOperation operation(self);
        self.hints().ProcessFuncdefComment(text.text(), index, line, is_arg);
      },
      nb::arg("hint"), nb::arg("tok_i"), nb::arg("funcdef_logical"), nb::arg("is_arg"));
  DefOperation(
      cls, "_ProcessArgSpecificComment",
      [](HintWalkerObject& self, Any arg) {
        const CArgInfo info = ArgOf(arg);
        const HintOperation operation(self);
        self.hints().ProcessArgSpecificComment(info);
      },
      nb::arg("arg"));
  DefOperation(
      cls, "_ParseFuncdefCommentHint",
      [](HintWalkerObject& self, Any hint, Any tok_i) {
        const HostText text = HostText::FromStr(hint);
        return WrapHintTree(self, self.hints().ParseFuncdefCommentHint(text.text(), Int32Of(tok_i)));
      },
      nb::arg("hint"), nb::arg("tok_i"));
}

template <nb::object HintWalkerObject::*Made, CNodeToTextConverter& (CTypeHintWalker::*Converter)()>
void DefConverter(HintClass& cls, const char* name) {
  cls.def_prop_ro(name, [](HintWalkerObject& self) {
    if (!(self.*Made).is_valid()) {
      CNodeToTextConverter* converter = &(self.hints().*Converter)();
      self.*Made = NewConverterObject(std::shared_ptr<CNodeToTextConverter>(self.walker, converter));
    }
    return self.*Made;
  });
}

int TraverseHintWalker(PyObject* self, visitproc visit, void* arg) {
  if (const int result = TraverseDispatch(self, visit, arg); result != 0 || !nb::inst_ready(self)) return result;
  auto& object = *nb::inst_ptr<HintWalkerObject>(self);
  // Never cleared: the core has its address. A walker's cycle goes by its line or its dict.
  Py_VISIT(object.general_node_walker.ptr());
  Py_VISIT(object.hint_parser.ptr());
  return 0;
}

int ClearHintWalker(PyObject* self) {
  ClearDispatch(self);
  if (!nb::inst_ready(self)) return 0;
  nb::object parser = std::exchange(nb::inst_ptr<HintWalkerObject>(self)->hint_parser, {});
  return 0;
}

const PyType_Slot kHintSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseHintWalker)},
                                  {Py_tp_clear, reinterpret_cast<void*>(ClearHintWalker)},
                                  {0, nullptr}};

}  // namespace

nb::object NewHintWalkerObject(std::shared_ptr<CTypeHintWalker> walker, nb::object general_node_walker,
                               nb::object version_triple) {
  HintWalkerObject object;
  object.walker = std::move(walker);
  object.general_node_walker = std::move(general_node_walker);
  object.version_triple = std::move(version_triple);
  return nb::cast(std::move(object));
}

void BindHints(nb::module_& m) {
  HintClass cls(m, "CTypeHintWalker", nb::type_slots(kHintSlots),
                "Finds type information in a statement and records it on its logical line.");
  cls.def("__init__", &InitHintWalker, nb::arg("version_triple"), nb::arg("grammar_file"),
          nb::arg("general_node_walker"));
  cls.def_prop_rw(
      "_fCommentHintCount", [](HintWalkerObject& self) { return self.hints().fCommentHintCount; },
      [](HintWalkerObject& self, Any value) { self.hints().fCommentHintCount = Int32Of(value); });
  cls.def_prop_ro("_fHintParser", [](HintWalkerObject& self) {
    if (!self.hint_parser.is_valid()) {
      nb::object keywords;
      KeywordList(nb::none(), keywords);
      self.hint_parser = NewParserObject(std::shared_ptr<CPGenParserImpl>(self.walker, &self.hints().hint_parser()),
                                         self.version_triple, std::move(keywords));
    }
    return self.hint_parser;
  });
  DefConverter<&HintWalkerObject::name_conv, &CTypeHintWalker::name_conv>(cls, "_fNameConv");
  DefConverter<&HintWalkerObject::hint_conv, &CTypeHintWalker::hint_conv>(cls, "_fHintConv");
  cls.def_prop_ro("_fGeneralNodeWalker", [](HintWalkerObject& self) { return self.general_node_walker; });
  DefOperation(
      cls, "Walk",
      [](HintWalkerObject& self, Any node, Any logical, Truth first_in_def) {
        CNode* root = NodeOrNull(node);
        LineObject& line = LineOf(logical);
        if (root != nullptr) RefuseSecondWalk(self);
        const OneThread use(self.walker->thread_use, kTheWalker);
        const WalkOfHost walk(self, logical);
        const Recording recording(&line);
        self.hints().WalkAnyTree(root, &line.line(), first_in_def);
      },
      nb::arg("node"), nb::arg("logical"), nb::arg("first_in_def"));
  DefOperation(
      cls, "_VisitNode",
      [](HintWalkerObject& self, Any node) {
        CNode* root = NodeOrNull(node);
        const HintOperation operation(self);
        self.walker->VisitNode(root);
      },
      nb::arg("node"));
  BindHintComments(cls);
  BindHintStatements(cls);
  BindSignatures(cls);
}

}  // namespace quillet::host
