// CNodeToTextConverter and its implementation.
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/host_call.h"
#include "bindings/node_ref.h"
#include "text/node_to_text.h"

namespace quillet::host {
namespace {

// The abstract operation, whose own body gives None.
struct ConverterBase {};

struct ConverterObject : ConverterBase {
  std::shared_ptr<CNodeToTextConverter> converter;
};

CNode* RequiredNode(nb::handle node) {
  CNode* result = NodeOrNull(node);
  if (result == nullptr) ThrowNoAttribute("fText");
  return result;
}

}  // namespace

nb::object NewConverterObject(std::shared_ptr<CNodeToTextConverter> converter) {
  ConverterObject object;
  object.converter = std::move(converter);
  return nb::cast(std::move(object));
}

void BindText(nb::module_& tarvex) {
  PyObject* const literal_names = PyFrozenSet_New(nb::make_tuple("None", "True", "False").ptr());
  if (literal_names == nullptr) throw nb::python_error();
  tarvex.attr("kLiteralNameTexts") = nb::steal(literal_names);

  nb::class_<ConverterBase> base(tarvex, "CNodeToTextConverter", "Gives a node's text, or None.");
  base.def(nb::init<>());
  DefOperation(
      base, "TextForNode", [](ConverterBase&, Any node, const nb::args&, const nb::kwargs&) { RefOrNull(node); },
      nb::arg("node"), nb::arg("args"), nb::arg("kwargs"));

  nb::class_<ConverterObject, ConverterBase> cls(tarvex, "CNodeToTextConverterImpl",
                                                 "The short, stable text of a node, as UTF-8 bytes.");
  cls.def(
      "__init__",
      [](ConverterObject* self, Truth include_bracket_text, Truth include_string_contents, Truth include_arg_text) {
        new (self) ConverterObject();
        self->converter =
            std::make_shared<CNodeToTextConverter>(include_bracket_text, include_string_contents, include_arg_text);
      },
      nb::arg("include_bracket_text") = false, nb::arg("include_string_contents") = false,
      nb::arg("include_arg_text") = false);
  cls.def_prop_ro("_fIncludeBracketText", [](ConverterObject& self) { return self.converter->include_bracket_text(); });
  cls.def_prop_ro("_fIncludeStringContents",
                  [](ConverterObject& self) { return self.converter->include_string_contents(); });
  cls.def_prop_ro("_fIncludeArgText", [](ConverterObject& self) { return self.converter->include_arg_text(); });
  DefOperation(
      cls, "TextForNode",
      [](ConverterObject& self, Any node, Truth dotted_name_only, Truth discard_simple_parens, Truth literal_only,
         Truth add_parens_if_operator) {
        return BytesOf(self.converter->TextForNode(
            RequiredNode(node), {dotted_name_only, discard_simple_parens, literal_only, add_parens_if_operator}));
      },
      nb::arg("node"), nb::arg("dotted_name_only") = false, nb::arg("discard_simple_parens") = true,
      nb::arg("literal_only") = false, nb::arg("add_parens_if_operator") = false,
      "The node's text as UTF-8 bytes, or None where it has none in the mode asked for.");
  DefOperation(
      cls, "TextForAtomPlusTrailers",
      [](ConverterObject& self, Any atom, Any trailers, Truth dotted_name_only, Truth discard_simple_parens,
         Truth literal_only) {
        const std::vector<CNode*> nodes = NodesOf(trailers, NodeKind::kCTrailer);
        return BytesOf(self.converter->TextForAtomPlusTrailers(
            RequiredNode(atom), nodes, {dotted_name_only, discard_simple_parens, literal_only, false}));
      },
      nb::arg("atom"), nb::arg("trailers"), nb::arg("dotted_name_only") = false,
      nb::arg("discard_simple_parens") = true, nb::arg("literal_only") = false);
  DefOperation(
      cls, "_TextForStringLiteral",
      [](ConverterObject& self, Any node) {
        CNode* literal = RefOf(node, NodeKind::kCStringLiteral).node();
        return BytesOf(self.converter->TextForStringLiteral(static_cast<CStringLiteral*>(literal)));
      },
      nb::arg("node"));
}

}  // namespace quillet::host
