// CMatchCaseStatementParser: the two entry points, and the steps between them for a host that sets
// _fToks and _fPositions itself.
#include <algorithm>
#include <utility>
#include <vector>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/matchcase_object.h"
#include "bindings/node_ref.h"
#include "bindings/parser_object.h"
#include "parser/match_case_parser.h"
#include "parser/parser.h"

namespace quillet::host {
namespace {

using Class = nb::class_<MatchcaseObject>;

NodePool& PoolOf(MatchcaseObject& self) { return nb::cast<ParserObject&>(self.pgen_parser).parser->factory().pool(); }

// Tokens that a statement, or another object on the same parser, replaced meanwhile are gone.
void Refresh(MatchcaseObject& self) {
  if (self.change_count == self.parser->change_count()) return;
  self.change_count = self.parser->change_count();
  const nb::object toks = std::move(self.toks);  // let go of last: the host's code may run then
  const nb::object positions = std::move(self.positions);
  self.source = {};
}

void Put(MatchcaseObject& self, nb::object toks, nb::object positions) {
  Ref<SourceText> source;
  std::vector<Position> places;
  if (toks.is_valid()) source = SourceOfTokens(toks);
  if (positions.is_valid()) places = PositionsOf(positions);
  self.parser->Run([&] {
    if (source) {
      self.parser->SetTokens(source->tokens, PositionView(places));
    } else {
      self.parser->ClearTokens();
    }
  });
  self.change_count = self.parser->change_count();
  std::swap(self.toks, toks);  // what was there is let go of last
  std::swap(self.positions, positions);
  std::swap(self.source, source);
}

// A tuple, or null for None.
nb::object TupleField(Any value) {
  if (value.is_none()) return {};
  if (!PyTuple_Check(value.ptr())) ThrowExpected("tuple", value);
  return TupleOf(value);
}

nb::object FieldOrNone(MatchcaseObject& self, nb::object MatchcaseObject::*field) {
  Refresh(self);
  return (self.*field).is_valid() ? self.*field : nb::object(nb::none());
}

void RequireTokens(MatchcaseObject& self) {
  Refresh(self);
  if (!self.toks.is_valid()) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
}

// An index of the host's; one that no line has tokens for is brought to where sums stay in range.
int64_t IndexOf(nb::handle object) {
  constexpr int64_t kFar = int64_t{1} << 40;
  return std::clamp(Int64Of(object), -kFar, kFar);
}

// Runs a step on the tokens in place; its arguments are converted by then, since that is the host's
// code and may put others there.
template <class Operation>
nb::object Step(MatchcaseObject& self, Operation&& operation) {
  RequireTokens(self);
  if (!self.positions.is_valid()) ThrowError(ErrorKind::kTypeError, "'NoneType' object is not subscriptable");
  const Ref<SourceText> source = self.source;
  PinSource(PoolOf(self), source.get());
  return Wrap(self.parser->Run(operation), source);
}

template <CNode* (CMatchCaseStatementParser::*Operation)()>
nb::object ParseStep(MatchcaseObject& self) {
  return Step(self, [&] { return (self.parser.get()->*Operation)(); });
}

template <CNode* (CMatchCaseStatementParser::*Operation)(int64_t, int64_t)>
nb::object PatternStep(MatchcaseObject& self, Any start, Any end) {
  const int64_t first = IndexOf(start);
  const int64_t last = IndexOf(end);
  return Step(self, [&] { return (self.parser.get()->*Operation)(first, last); });
}

nb::object NodeForPattern(MatchcaseObject& self, Any start, Any end, Any allow_as) {
  const int64_t first = IndexOf(start);
  const int64_t last = IndexOf(end);
  const int as = PyObject_IsTrue(allow_as.ptr());
  if (as < 0) throw nb::python_error();
  return Step(self, [&] { return self.parser->NodeForPattern(first, last, as != 0); });
}

int64_t NonNestedFindTokenIndex(MatchcaseObject& self, Any tok, Any start, Any end) {
  const HostText wanted = HostText::FromStr(tok);
  const int64_t first = IndexOf(start);
  const int64_t last = IndexOf(end);
  if (last > first) RequireTokens(self);
  return self.parser->NonNestedFindTokenIndex(wanted.text(), first, last);
}

nb::object TokNode(MatchcaseObject& self, Any tok_i) {
  const int64_t index = IndexOf(tok_i);
  return Step(self, [&] { return self.parser->TokNode(index); });
}

nb::object ParseExceptionAt(MatchcaseObject& self, Any tok_i) {
  const int64_t index = IndexOf(tok_i);
  RequireTokens(self);
  const ParseError error = self.parser->ParseExceptionAt(index);
  return ExceptionFor(error);
}

struct KeptTokens {
  nb::object toks;
  nb::object positions;
};

nb::list FrontOf(nb::handle sequence, size_t count) {
  return nb::list(nb::object(sequence[nb::slice(static_cast<Py_ssize_t>(count))]));
}

// The two arguments themselves where nothing is dropped, tuples of what is left otherwise. Whatever
// can be indexed will do, and a position is looked at only behind a backslash.
KeptTokens WithoutSkipped(nb::handle toks, nb::handle positions) {
  const auto item = [](nb::handle sequence, size_t i) { return nb::object(sequence[nb::int_(i)]); };
  const auto row = [&](size_t i) { return item(item(positions, i), 0); };
  const auto begins_with = [](nb::handle first, const char* character) {
    return PyUnicode_Check(first.ptr()) && PyUnicode_CompareWithASCIIString(first.ptr(), character) == 0;
  };
  nb::object kept_toks, kept_positions;  // lists from the first token on that is dropped
  const size_t count = nb::len(toks);
  for (size_t i = 0; i < count; ++i) {
    const nb::object tok = item(toks, i);
    const nb::object first = item(tok, 0);
    if (begins_with(first, "#") || (begins_with(first, "\\") && i + 1 < count && row(i) < row(i + 1))) {
      if (kept_toks.is_valid()) continue;
      kept_toks = FrontOf(toks, i);
      kept_positions = FrontOf(positions, i);
    } else if (kept_toks.is_valid()) {
      nb::borrow<nb::list>(kept_toks).append(tok);
      nb::borrow<nb::list>(kept_positions).append(item(positions, i));
    }
  }
  if (!kept_toks.is_valid()) return {nb::borrow(toks), nb::borrow(positions)};
  return {nb::tuple(kept_toks), nb::tuple(kept_positions)};
}

nb::object RemoveSkipToks(MatchcaseObject&, Any toks, Any positions) {
  const KeptTokens kept = WithoutSkipped(toks, positions);
  return nb::make_tuple(kept.toks, kept.positions);
}

template <CNode* (CMatchCaseStatementParser::*Operation)()>
nb::object ParseStatement(MatchcaseObject& self, Any toks, Any positions) {
  const KeptTokens kept = WithoutSkipped(toks, positions);
  for (const nb::object& half : {kept.toks, kept.positions})
    if (!PyTuple_Check(half.ptr())) ThrowExpected("tuple", half);
  const Ref<SourceText> source = SourceOfTokens(TupleOf(kept.toks));
  const std::vector<Position> places = PositionsOf(TupleOf(kept.positions));
  PinSource(PoolOf(self), source.get());
  CMatchCaseStatementParser& parser = *self.parser;
  CNode* node = parser.Run([&] {
    struct Clear {
      CMatchCaseStatementParser& parser;
      ~Clear() { parser.ClearTokens(); }
    } clear{parser};
    parser.SetTokens(source->tokens, PositionView(places));
    return (parser.*Operation)();
  });
  return Wrap(node, source);
}

int TraverseMatchcase(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (!nb::inst_ready(self)) return 0;
  MatchcaseObject* object = nb::inst_ptr<MatchcaseObject>(self);
  Py_VISIT(object->pgen_parser.ptr());
  Py_VISIT(object->toks.ptr());
  Py_VISIT(object->positions.ptr());
  return 0;
}

// The parser at the other end of a cycle lets go; of the tokens that the host set this has to.
int ClearMatchcase(PyObject* self) {
  if (!nb::inst_ready(self)) return 0;
  MatchcaseObject* object = nb::inst_ptr<MatchcaseObject>(self);
  const nb::object toks = std::move(object->toks);
  const nb::object positions = std::move(object->positions);
  return 0;
}

const PyType_Slot kMatchcaseSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseMatchcase)},
                                       {Py_tp_clear, reinterpret_cast<void*>(ClearMatchcase)},
                                       {0, nullptr}};

}  // namespace

nb::object NewMatchcaseObject(std::shared_ptr<CMatchCaseStatementParser> parser, nb::handle pgen_parser) {
  MatchcaseObject object;
  object.parser = std::move(parser);
  object.pgen_parser = nb::borrow(pgen_parser);
  return nb::cast(std::move(object));
}

void BindMatchcase(nb::module_& tarvex) {
  Class cls(tarvex, "CMatchCaseStatementParser", nb::type_slots(kMatchcaseSlots),
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
  cls.def_prop_rw(
      "_fToks", [](MatchcaseObject& self) { return FieldOrNone(self, &MatchcaseObject::toks); },
      [](MatchcaseObject& self, Any value) {
        nb::object toks = TupleField(value);
        Refresh(self);
        Put(self, std::move(toks), self.positions);
      },
      nb::arg("value"));
  cls.def_prop_rw(
      "_fPositions", [](MatchcaseObject& self) { return FieldOrNone(self, &MatchcaseObject::positions); },
      [](MatchcaseObject& self, Any value) {
        nb::object positions = TupleField(value);
        Refresh(self);
        Put(self, self.toks, std::move(positions));
      },
      nb::arg("value"));

  DefOperation(cls, "ParseMatchStmt", &ParseStatement<&CMatchCaseStatementParser::ParseMatchStmtImpl>, nb::arg("toks"),
               nb::arg("positions"), "A CMatchStmt, or None for a line that is no such statement.");
  DefOperation(cls, "ParseCaseStmt", &ParseStatement<&CMatchCaseStatementParser::ParseCaseStmtImpl>, nb::arg("toks"),
               nb::arg("positions"), "A CCaseStmt, or None for a line that is no such statement.");
  DefOperation(cls, "_ParseMatchStmtImpl", &ParseStep<&CMatchCaseStatementParser::ParseMatchStmtImpl>);
  DefOperation(cls, "_ParseCaseStmtImpl", &ParseStep<&CMatchCaseStatementParser::ParseCaseStmtImpl>);
  DefOperation(cls, "_RemoveSkipToks", &RemoveSkipToks, nb::arg("toks"), nb::arg("positions"));
  DefOperation(cls, "_NonNestedFindTokenIndex", &NonNestedFindTokenIndex, nb::arg("tok"), nb::arg("start"),
               nb::arg("end"));
  DefOperation(cls, "_NodeForPattern", &NodeForPattern, nb::arg("start"), nb::arg("end"), nb::arg("allow_as") = true);
  const auto def_step = [&cls](const char* name, auto operation) {
    DefOperation(cls, name, operation, nb::arg("start"), nb::arg("end"));
  };
  def_step("_NodeForSequencePattern", &PatternStep<&CMatchCaseStatementParser::NodeForSequencePattern>);
  def_step("_NodeForMappingPattern", &PatternStep<&CMatchCaseStatementParser::NodeForMappingPattern>);
  def_step("_NodeForClassPattern", &PatternStep<&CMatchCaseStatementParser::NodeForClassPattern>);
  def_step("_NodeForDottedNameValue", &PatternStep<&CMatchCaseStatementParser::NodeForDottedNameValue>);
  def_step("_NodeForNumberPattern", &PatternStep<&CMatchCaseStatementParser::NodeForNumberPattern>);
  DefOperation(cls, "_TokNode", &TokNode, nb::arg("tok_i"));
  DefOperation(cls, "_ParseExceptionAt", &ParseExceptionAt, nb::arg("tok_i"));
}

}  // namespace quillet::host
