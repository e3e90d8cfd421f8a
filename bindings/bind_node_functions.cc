// The free operations over nodes, and the instance names of literals.
#include <string>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "tree/arg_info.h"
#include "tree/nodes.h"
#include "vocabulary/symbolinfo.h"

namespace quillet::host {
namespace {

using Source = Ref<SourceText>;

template <class T>
T* ArgumentAs(nb::handle node, Source& source) {
  NodeRef& ref = RefOf(node, NodeKindRange<T>::kFirst);
  source = ref.source();
  return static_cast<T*>(ref.node());
}

void BindFreeOperations(nb::module_& m) {
  DefOperation(
      m, "GetDefiningArgInfoList",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        try {
          return WrapArgList(GetDefiningArgInfoList(root), source);
        } catch (const NotANameError& error) {
          nb::object what = nb::make_tuple(Wrap(error.node, source), StrOf(error.node->fText()));
          PyErr_SetObject(PyExc_AssertionError, nb::make_tuple(what).ptr());
          throw nb::python_error();
        }
      },
      nb::arg("node"),
      "The parameters of the node behind `def name` or `lambda`: a list of CArgInfo, nested for tuple parameters.");
  DefOperation(
      m, "GetUsedArgInfoList",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        return WrapUsedArgs(GetUsedArgInfoList(root), source);
      },
      nb::arg("node"), "The arguments of the inside of `value(...)`, as a list of CArgInfo.");
  DefOperation(
      m, "GetTokenEndIndex",
      [](Any node) {
        Source source;
        const CNode* leaf = LastLeaf(ArgumentAs<CNode>(node, source));
        if (leaf->fContext.IsIndex()) return GetTokenEndIndex(leaf);
        // Whatever a host put there, as far as one can be added to it.
        nb::object end = nb::steal(PyNumber_Add(HostContext(leaf->fContext).ptr(), nb::int_(1).ptr()));
        if (!end.is_valid()) throw nb::python_error();
        return Int64Of(end);
      },
      nb::arg("node"), "The token index just past a node.");
  DefOperation(
      m, "_TextForImportName",
      [](Any nodes) { return StrOf(TextForImportName(NodesOf(nodes, NodeKind::kCNode, true))); }, nb::arg("nodes"));
  DefOperation(
      m, "_ProcessAsNamesList",
      [](Any node) {
        Source source;
        nb::list list;
        for (const CAsName& name : ProcessAsNamesList(ArgumentAs<CNode>(node, source))) list.append(WrapAsName(name));
        return list;
      },
      nb::arg("node"));
  DefOperation(
      m, "_ProcessSingleModuleNameAs",
      [](Any node) {
        Source source;
        return WrapAsName(ProcessSingleModuleNameAs(ArgumentAs<CNode>(node, source)));
      },
      nb::arg("node"));
  DefOperation(
      m, "_GetMatchingChildToken",
      [](Any node, Any text) {
        Source source;
        const HostText wanted = HostText::FromStr(text);
        return GetMatchingChildToken(ArgumentAs<CNode>(node, source), wanted.text());
      },
      nb::arg("node"), nb::arg("text"));

  DefOperation(
      m, "DropSimpleParens",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        return Wrap(DropSimpleParens(root), source);
      },
      nb::arg("node"), "The inside of `( test )`, however deep; any other node as it is.");
  DefOperation(
      m, "ExpandSeqLiteral",
      [](Any node) {
        Source source;
        CNode* root = ArgumentAs<CNode>(node, source);
        NodeList elements;
        return ExpandSeqLiteral(root, elements) ? WrapList(elements, source) : nb::object(nb::none());
      },
      nb::arg("node"), "The elements of a parenthesised tuple; None for anything else.");
  DefOperation(
      m, "IsSetLiteral",
      [](Any node) {
        Source source;
        return IsSetLiteral(ArgumentAs<CAtom>(node, source));
      },
      nb::arg("node"), "True for an atom that is clearly a set display.");
  DefOperation(
      m, "IsGenExpression",
      [](Any atom_node) {
        Source source;
        return IsGenExpression(ArgumentAs<CAtom>(atom_node, source));
      },
      nb::arg("atom_node"), "True for a parenthesised atom with a direct child `for`.");
  DefOperation(
      m, "IsTupleLiteralNode",
      [](Any node) {
        Source source;
        return IsTupleLiteralNode(ArgumentAs<CNode>(node, source));
      },
      nb::arg("node"), "True for a tuple, bare or in any number of parentheses.");
}

void BindInstanceNames(nb::module_& m) {
  m.attr("kListInstanceName") = BytesOf(kListInstanceName);
  m.attr("kDictInstanceName") = BytesOf(kDictInstanceName);
  m.attr("kSetInstanceName") = BytesOf(kSetInstanceName);
  m.attr("kTupleInstanceName") = BytesOf(kTupleInstanceName);
  m.attr("kStringInstanceName") = BytesOf(kStringInstanceName);
  m.attr("kUnicodeInstanceName") = BytesOf(kUnicodeInstanceName);
  m.attr("kBytesInstanceName") = BytesOf(kBytesInstanceName);
  m.attr("kIntLiteralName") = BytesOf(kIntLiteralName);
  m.attr("kFloatLiteralName") = BytesOf(kFloatLiteralName);
  DefOperation(
      m, "_GetBuiltinInstanceName",
      [](Any cls_name) {
        const HostText name = HostText::FromStr(cls_name);
        std::string info(kTypedLiteralPrefix);
        AppendInstanceNameForClass(EnsureScopeNameIndicies(name.text()), info);
        return BytesOf(info);
      },
      nb::arg("cls_name"), "The info text of a literal of a builtin class.");
}

}  // namespace

void BindNodeFunctions(nb::module_& tarvex) {
  BindFreeOperations(tarvex);
  BindInstanceNames(tarvex);
}

}  // namespace quillet::host
