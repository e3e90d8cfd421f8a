// The fields and operations of CLogicalLine (line_type.cc), and the operations of the sibling module logicalline.
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/line_class.h"
#include "bindings/line_object.h"
#include "lines/cutter.h"
#include "lines/logical_line.h"

namespace quillet::host {
namespace {

void RememberOperation(LineClass::Operation& operation, nb::handle type, const char* name) {
  operation.name = PyUnicode_InternFromString(name);
  operation.builtin = type.attr(name).ptr();  // kept by the type
}

// The version that a host gives, or that of the interpreter.
Version VersionOrOwn(nb::handle version_triple) {
  return version_triple.is_none() ? Version{{PY_MAJOR_VERSION, PY_MINOR_VERSION, PY_MICRO_VERSION}, 3}
                                  : VersionOf(version_triple);
}

nb::object GetLogicalsFromText(Any text, Any version_triple) {
  HostText host_text = HostText::FromStrOrBytes(text);
  return CutToTuple(SourceText::Copy(host_text.text()), VersionOrOwn(version_triple));
}

nb::object FindKind(nb::handle toks, int64_t start, int64_t end) {
  nb::object tuple = TupleOf(toks);
  Ref<SourceText> source = SourceOfTokens(tuple);
  const int64_t count = static_cast<int64_t>(source->tokens.size());
  start = start < 0 ? 0 : start;
  end = end > count ? count : end;
  const LineKind kind = start < end ? FindMatchOrCaseType(source->tokens, start, end) : LineKind::kUnknown;
  return nb::borrow(g_line_class.kind_texts[static_cast<int>(kind)]);
}

}  // namespace

void BindLogicalline(nb::module_& tarvex) {
  nb::module_ m = SiblingModule(tarvex, "logicalline");
  m.attr("__name__") = "quillet.logicalline";

#define QUILLET_LINE_KIND(identifier, text) \
  g_line_class.kind_texts[static_cast<int>(LineKind::k##identifier)] = PyUnicode_InternFromString(text);
#include "lines/line_kinds.def"
#define QUILLET_LINE_KIND(identifier, text) \
  m.attr("k" #identifier) = nb::borrow(g_line_class.kind_texts[static_cast<int>(LineKind::k##identifier)]);
#include "lines/line_kinds.def"
  m.attr("kErrorTokenPrefix") = "error";

  // Only to define what it has.
  auto cls = nb::borrow<nb::class_<LineInstance>>(MakeLineClass());
  m.attr("CLogicalLine") = cls;
  cls.def_prop_rw(
      "fType", [](LineObject& self) { return self.GetType(); },
      [](LineObject& self, Any value) { self.SetType(value); });
  cls.def_prop_rw(
      "fToks", [](LineObject& self) { return self.GetToks(); },
      [](LineObject& self, Any value) { self.SetToks(value); });
  cls.def_prop_rw(
      "fTokTypes", [](LineObject& self) { return self.GetTokTypes(); },
      [](LineObject& self, Any value) { self.SetTokTypes(value); });
  cls.def_prop_rw(
      "fPositions", [](LineObject& self) { return self.GetPositions(); },
      [](LineObject& self, Any value) { self.SetPositions(value); });
  cls.def_prop_rw(
      "fParsed", [](LineObject& self) { return self.line().parsed; },
      [](LineObject& self, Truth value) { self.line().parsed = value; });
  cls.def_prop_rw(
      "fFirstLine", [](LineObject& self) { return self.line().first_line; },
      [](LineObject& self, Any value) { self.line().first_line = Int32Of(value); });
  cls.def_prop_rw(
      "fTokenCount", [](LineObject& self) { return self.GetTokenCount(); },
      [](LineObject& self, Any value) { self.SetTokenCount(Int32Of(value)); });
  cls.def(
      "GetTokType", [](LineObject& self, Any i) { return self.BuiltinGetTokType(Int64Of(i)); }, nb::arg("i"),
      "The token type id of token `i`.");
  cls.def(
      "AppendTypeEquiv",
      [](LineObject& self, Any name, Any equiv) {
        const HostText name_text = HostText::FromBytes(name);
        const HostText equiv_text = HostText::FromBytes(equiv);
        self.BuiltinAppend(name_text.text(), equiv_text.text());
      },
      nb::arg("name"), nb::arg("equiv"), "Appends a record of a name in the statement's own scope.");
  cls.def(
      "AppendArgTypeEquiv",
      [](LineObject& self, Any name, Any info) {
        const HostText name_text = HostText::FromBytes(name);
        const HostText info_text = HostText::FromBytes(info);
        self.BuiltinAppendArg(name_text.text(), info_text.text());
      },
      nb::arg("name"), nb::arg("info"), "Appends a record of a parameter of the scope that the statement opens.");
  cls.def(
      "SetParsed", [](LineObject& self, Truth parsed) { self.line().parsed = parsed; }, nb::arg("parsed"));
  cls.def(
      "ClearDerivedInfo", [](LineObject& self) { self.BuiltinClearDerivedInfo(); },
      "Removes everything that analysis wrote on the line.");
  cls.def(
      "GetExpLogicals", [](LineObject& self) { return self.BuiltinGetExpLogicals(); },
      "The expressions embedded in the line (f-string fields, stringified and commented hints).");
  cls.def("__repr__",
          [](LineObject& self) { return nb::str("<CLogicalLine {} {!r}>").format(self.GetType(), self.GetToks()); });

  RememberOperation(g_line_class.get_tok_type, cls, "GetTokType");
  RememberOperation(g_line_class.append, cls, "AppendTypeEquiv");
  RememberOperation(g_line_class.append_arg, cls, "AppendArgTypeEquiv");
  RememberOperation(g_line_class.set_parsed, cls, "SetParsed");
  RememberOperation(g_line_class.clear, cls, "ClearDerivedInfo");
  RememberOperation(g_line_class.get_exp_logicals, cls, "GetExpLogicals");

  m.def("GetLogicalsFromText", &GetLogicalsFromText, nb::arg("text"), nb::arg("version_triple") = nb::none(),
        "The logical lines of a text, in order, as a tuple of CLogicalLine.");
  m.def(
      "FindMatchOrCaseType", [](Any toks, Any start, Any end) { return FindKind(toks, Int64Of(start), Int64Of(end)); },
      nb::arg("toks"), nb::arg("start"), nb::arg("end"),
      "kMatch or kCase where the tokens are such a statement's head, kUnknown otherwise.");
  m.def(
      "IsScopeStartLogical", [](Any logical) { return IsScopeStartLogical(LineOf(logical).line()); },
      nb::arg("logical"), "True for a line that opens a scope: def, async def, class.");

  nb::module_ inspect = SiblingModule(tarvex, "logicalinspect");
  inspect.def(
      "_TextFromLine", [](Any logical) { return StrOf(TextFromTokens(LineOf(logical).line())); }, nb::arg("logical"));
  inspect.def(
      "_TextFromToks",
      [](Any toks, Any positions) {
        nb::object tuple = TupleOf(toks);
        Ref<SourceText> source = SourceOfTokens(tuple);
        const std::vector<Position> stored = PositionsOf(TupleOf(positions));
        return StrOf(TextFromTokens(source->tokens, PositionView(stored)));
      },
      nb::arg("toks"), nb::arg("positions"));
}

}  // namespace quillet::host
