// CMatchCaseStatementParser: the two entry points, and the steps between them for a host that sets
// _fToks and _fPositions itself.
#include "matchcase/match_case_parser.h"
#include "parser/parser.h"
#include "quillet/tarvex/bindings.h"
#include "quillet/tarvex/convert.h"
#include "quillet/tarvex/errors.h"
#include "quillet/tarvex/matchcase_object.h"
#include "quillet/tarvex/node_ref.h"
#include "quillet/tarvex/parser_object.h"

namespace quillet::host {
namespace {

using Class = nb::class_<MatchcaseObject>;

NodePool& PoolOf(MatchcaseObject& self) { return nb::cast<ParserObject&>(self.pgen_parser).parser->factory().pool(); }

// The steps read the tokens as they stand: they are set once both halves are there.
void PutTokens(MatchcaseObject& self) {
  self.parser->ClearTokens();
  if (!self.toks.is_valid() || !self.positions.is_valid()) return;
  self.source = SourceOfTokens(self.toks);
  const std::vector<Position> positions = PositionsOf(self.positions);
  self.parser->SetTokens(self.source->tokens, PositionView(positions));
}

template <nb::object MatchcaseObject::*Field>
void SetField(MatchcaseObject& self, Any value) {
  self.*Field = value.is_none() ? nb::object() : TupleOf(value);
  PutTokens(self);
}

template <nb::object MatchcaseObject::*Field>
nb::object GetField(MatchcaseObject& self) {
  return (self.*Field).is_valid() ? self.*Field : nb::object(nb::none());
}

template <CNode* (CMatchCaseStatementParser::*Operation)(TokenSpan, const PositionView&)>
nb::object ParseStatement(MatchcaseObject& self, Any toks, Any positions) {
  TokensArg tokens(toks);
  PositionsArg places(positions);
  PinSource(PoolOf(self), tokens.source);
  return Wrap((self.parser.get()->*Operation)(tokens.toks(), places.Required()), tokens.source);
}

template <CNode* (CMatchCaseStatementParser::*Operation)()>
nb::object ParseStep(MatchcaseObject& self) {
  PinSource(PoolOf(self), self.source);
  return Wrap((self.parser.get()->*Operation)(), self.source);
}

template <CNode* (CMatchCaseStatementParser::*Operation)(int64_t, int64_t)>
nb::object PatternStep(MatchcaseObject& self, Any start, Any end) {
  PinSource(PoolOf(self), self.source);
  return Wrap((self.parser.get()->*Operation)(Int64Of(start), Int64Of(end)), self.source);
}

// The two arguments themselves where nothing is dropped, tuples of what is left otherwise.
nb::object RemoveSkipToks(MatchcaseObject& self, Any toks, Any positions) {
  nb::object tok_tuple = TupleOf(toks);
  nb::object place_tuple = TupleOf(positions);
  Ref<SourceText> source = SourceOfTokens(tok_tuple);
  const std::vector<Position> places = PositionsOf(place_tuple);
  CMatchCaseStatementParser scratch(nb::cast<ParserObject&>(self.pgen_parser).parser.get());
  scratch.SetTokens(source->tokens, PositionView(places));
  const TokenSpan kept = scratch.toks();
  if (kept.size() == source->tokens.size()) return nb::make_tuple(nb::borrow(toks), nb::borrow(positions));
  nb::list kept_toks, kept_places;
  size_t next = 0;
  for (size_t i = 0; i < source->tokens.size() && next < kept.size(); ++i) {
    if (source->tokens[i].text != kept[next].text) continue;
    ++next;
    kept_toks.append(nb::handle(PyTuple_GET_ITEM(tok_tuple.ptr(), i)));
    kept_places.append(nb::handle(PyTuple_GET_ITEM(place_tuple.ptr(), i)));
  }
  return nb::make_tuple(nb::tuple(kept_toks), nb::tuple(kept_places));
}

int Traverse(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (nb::inst_ready(self)) Py_VISIT(nb::inst_ptr<MatchcaseObject>(self)->pgen_parser.ptr());
  return 0;
}

int Clear(PyObject*) { return 0; }  // the parser at the other end of the cycle lets go

const PyType_Slot kSlots[] = {
    {Py_tp_traverse, reinterpret_cast<void*>(Traverse)}, {Py_tp_clear, reinterpret_cast<void*>(Clear)}, {0, nullptr}};

}  // namespace

nb::object NewMatchcaseObject(std::shared_ptr<CMatchCaseStatementParser> parser, nb::handle pgen_parser) {
  MatchcaseObject object;
  object.parser = std::move(parser);
  object.pgen_parser = nb::borrow(pgen_parser);
  return nb::cast(std::move(object));
}

void BindMatchcase(nb::module_& tarvex) {
  Class cls(tarvex, "CMatchCaseStatementParser", nb::type_slots(kSlots),
            "Parses the heads of match and case statements.");
  cls.def(
      "__init__",
      [](MatchcaseObject* self, Any pgen_parser) {
        ParserObject* object = InstanceOf<ParserObject>(pgen_parser);
        if (object == nullptr) ThrowExpected("CPGenParserImpl", pgen_parser);
        new (self) MatchcaseObject();
        self->parser = std::make_shared<CMatchCaseStatementParser>(object->parser.get());
        self->pgen_parser = nb::borrow(pgen_parser);
      },
      nb::arg("pgen_parser"));
  cls.def_prop_ro("_fPGenParser", [](MatchcaseObject& self) { return self.pgen_parser; });
  cls.def_prop_ro("_fNodeFactory",
                  [](MatchcaseObject& self) { return nb::object(self.pgen_parser.attr("_fNodeFactory")); });
  cls.def_prop_rw("_fToks", &GetField<&MatchcaseObject::toks>, &SetField<&MatchcaseObject::toks>, nb::arg("value"));
  cls.def_prop_rw("_fPositions", &GetField<&MatchcaseObject::positions>, &SetField<&MatchcaseObject::positions>,
                  nb::arg("value"));

  cls.def("ParseMatchStmt", &ParseStatement<&CMatchCaseStatementParser::ParseMatchStmt>, nb::arg("toks"),
          nb::arg("positions"), "A CMatchStmt, or None for a line that is no such statement.");
  cls.def("ParseCaseStmt", &ParseStatement<&CMatchCaseStatementParser::ParseCaseStmt>, nb::arg("toks"),
          nb::arg("positions"), "A CCaseStmt, or None for a line that is no such statement.");
  cls.def("_ParseMatchStmtImpl", &ParseStep<&CMatchCaseStatementParser::ParseMatchStmtImpl>);
  cls.def("_ParseCaseStmtImpl", &ParseStep<&CMatchCaseStatementParser::ParseCaseStmtImpl>);
  cls.def("_RemoveSkipToks", &RemoveSkipToks, nb::arg("toks"), nb::arg("positions"));
  cls.def(
      "_NonNestedFindTokenIndex",
      [](MatchcaseObject& self, Any tok, Any start, Any end) {
        const HostText wanted = HostText::FromStr(tok);
        return self.parser->NonNestedFindTokenIndex(wanted.text(), Int64Of(start), Int64Of(end));
      },
      nb::arg("tok"), nb::arg("start"), nb::arg("end"));
  cls.def(
      "_NodeForPattern",
      [](MatchcaseObject& self, Any start, Any end, Truth allow_as) {
        PinSource(PoolOf(self), self.source);
        return Wrap(self.parser->NodeForPattern(Int64Of(start), Int64Of(end), allow_as), self.source);
      },
      nb::arg("start"), nb::arg("end"), nb::arg("allow_as") = true);
  const auto def_step = [&cls](const char* name, auto operation) {
    cls.def(name, operation, nb::arg("start"), nb::arg("end"));
  };
  def_step("_NodeForSequencePattern", &PatternStep<&CMatchCaseStatementParser::NodeForSequencePattern>);
  def_step("_NodeForMappingPattern", &PatternStep<&CMatchCaseStatementParser::NodeForMappingPattern>);
  def_step("_NodeForClassPattern", &PatternStep<&CMatchCaseStatementParser::NodeForClassPattern>);
  def_step("_NodeForDottedNameValue", &PatternStep<&CMatchCaseStatementParser::NodeForDottedNameValue>);
  def_step("_NodeForNumberPattern", &PatternStep<&CMatchCaseStatementParser::NodeForNumberPattern>);
  cls.def(
      "_TokNode",
      [](MatchcaseObject& self, Any tok_i) {
        PinSource(PoolOf(self), self.source);
        return Wrap(self.parser->TokNode(Int64Of(tok_i)), self.source);
      },
      nb::arg("tok_i"));
  cls.def(
      "_ParseExceptionAt",
      [](MatchcaseObject& self, Any tok_i) {
        const ParseError error = self.parser->ParseExceptionAt(Int64Of(tok_i));
        return ExceptionFor(error);
      },
      nb::arg("tok_i"));
}

}  // namespace quillet::host
