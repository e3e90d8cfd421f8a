// CPGenAnalyzerImpl and CreateSyntaxError.
#include <algorithm>
#include <exception>
#include <limits>
#include <optional>
#include <vector>

#include "analysis/analyzer.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/hints_object.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "bindings/node_ref.h"
#include "bindings/parser_object.h"
#include "bindings/walker_object.h"
#include "lines/syntax_error.h"

namespace quillet::host {
namespace {

// Whether the host gave states other classes than they have.
bool HasOwnKinds(const CPGenAnalyzerImpl::Options& options) {
  return !std::ranges::is_permutation(options.kinds_by_state, KindsByStateName());
}

void InitAnalyzer(AnalyzerObject* self, Any version_triple, Any grammar_file, Any keyword_seq, Truth py3_grammar,
                  Any hint_grammar_file) {
  new (self) AnalyzerObject();
  try {
    CPGenAnalyzerImpl::Options options;
    ReadOptions(options, version_triple, grammar_file, keyword_seq, self->keywords);
    options.hint_grammar_file = ResolveGrammarFile(hint_grammar_file);
    nb::object hint_keywords;
    options.hint_keywords = KeywordList(nb::none(), hint_keywords);
    options.py3_grammar = py3_grammar;
    self->version_triple = nb::borrow(version_triple);
    self->analyzer = std::make_shared<CPGenAnalyzerImpl>(options);
    if (!HasOwnKinds(options)) self->shapes = std::make_unique<StatementShapes>(*self->analyzer);
  } catch (...) {
    self->~AnalyzerObject();
    throw;
  }
}

// An analyzer is its parser and its walkers: an operation claims all three.
class AnalyzerUse {
 public:
  explicit AnalyzerUse(CPGenAnalyzerImpl& analyzer) : AnalyzerUse(analyzer, ThreadUse::ThisThread()) {}

 private:
  static constexpr const char* kTheAnalyzer = "the analyzer";

  AnalyzerUse(CPGenAnalyzerImpl& analyzer, const void* self)
      : parser_(analyzer.logical_parser().thread_use, kTheAnalyzer, self),
        walker_(analyzer.node_walker().thread_use, kTheAnalyzer, self),
        hint_walker_(analyzer.type_hint_walker().thread_use, kTheAnalyzer, self) {}

  OneThread parser_;
  OneThread walker_;
  OneThread hint_walker_;
};

// While the host holds wrappers of an analyzer's nodes, what an analysis leaves in nodes must stay
// readable: texts of the line's source, and those of hints, which stand with the line's records.
class Retained {
 public:
  Retained(CPGenAnalyzerImpl& analyzer, SourceText* source)
      : hint_pool_(analyzer.type_hint_walker().hint_parser().factory().pool()) {
    PinSource(analyzer.logical_parser().factory().pool(), source);
    FreeRetiredArrays(hint_pool_);
  }
  ~Retained() { RehomeTexts(hint_pool_); }
  Retained(const Retained&) = delete;
  Retained& operator=(const Retained&) = delete;

 private:
  NodePool& hint_pool_;
};

nb::object Analyze(AnalyzerObject& self, Any logical, Truth in_async_def, Truth first_in_def) {
  LineObject& object = LineOf(logical);
  LogicalLine& line = object.line();
  if (line.parsed) return nb::none();
  const AnalyzerUse use(*self.analyzer);
  object.BeginAnalysis();
  const std::optional<SyntaxError> error = [&] {
    const Retained retained(*self.analyzer, line.source);
    return self.shapes == nullptr || self.is_looked_into
               ? self.analyzer->AnalyzeSingleLogical(line, in_async_def, first_in_def)
               : self.shapes->AnalyzeSingleLogical(line, in_async_def, first_in_def);
  }();
  object.EndWriting();
  if (!error) [[likely]] {
    return nb::none();
  }
  nb::object raised = TakeHostSyntaxError(*error);
  return raised.is_valid() ? raised : ExceptionFor(*error);
}

// The operation as it was bound, for all but plain calls.
PyObject* g_bound_analyze;

// A host calls it for every statement. A call with its arguments in order, and with truths that are plain, is taken as
// it comes.
PyObject* AnalyzeSingleLogical(PyObject* self, PyObject* const* args, Py_ssize_t count, PyObject* names) {
  const auto is_plain = [](PyObject* truth) { return truth == Py_True || truth == Py_False; };
  const bool is_plain_call = names == nullptr && (count == 2 || count == 3) && is_plain(args[1]) &&
                             is_plain(args[count - 1]) && nb::inst_ready(self);
  if (!is_plain_call) [[unlikely]] {
    std::vector<PyObject*> all{self};
    all.insert(all.end(), args, args + count + (names == nullptr ? 0 : PyTuple_GET_SIZE(names)));
    return PyObject_Vectorcall(g_bound_analyze, all.data(), static_cast<size_t>(count) + 1, names);
  }
  try {
    const Operation under_way;
    return Analyze(*nb::inst_ptr<AnalyzerObject>(self), {args[0]}, {args[1] == Py_True},
                   {count == 3 && args[2] == Py_True})
        .release()
        .ptr();
  } catch (...) {
    SetHostError(std::current_exception());
    return nullptr;
  }
}

PyMethodDef kAnalyzeSingleLogical = {"AnalyzeSingleLogical",
                                     reinterpret_cast<PyCFunction>(reinterpret_cast<void (*)()>(AnalyzeSingleLogical)),
                                     METH_FASTCALL | METH_KEYWORDS,
                                     "AnalyzeSingleLogical($self, logical, in_async_def, first_in_def=False)\n--\n\n"
                                     "Analyses a line once and gives the exception that describes a failure, or None."};

bool Inspect(AnalyzerObject& self, Any logical, Truth in_async_def, Truth in_embedded_expression, Truth first_in_def) {
  LineObject& object = LineOf(logical);
  const AnalyzerUse use(*self.analyzer);
  Recording recording(&object);
  const Retained retained(*self.analyzer, object.line().source);
  return self.LookInto().InspectSingleLogical(object.line(), in_async_def, in_embedded_expression, first_in_def);
}

void InspectEmbedded(AnalyzerObject& self, Any logical, Any node, Truth in_async_def, Truth first_in_def) {
  LineObject& object = LineOf(logical);
  RefOrNull(node);
  const AnalyzerUse use(*self.analyzer);
  Recording recording(&object);
  const Retained retained(*self.analyzer, object.line().source);
  self.LookInto().InspectEmbeddedExpressions(object.line(), in_async_def, first_in_def);
}

// ---- syntax errors ----

nb::object SyntaxErrorFor(Any msg, Any logical, Any context, Any pos_info_in_tok) {
  const HostText message = HostText::FromStr(msg);
  Position in_token;
  if (!pos_info_in_tok.is_none()) {
    in_token.line = Int32Of(nb::object(pos_info_in_tok.attr("lineno")));
    in_token.col = Int32Of(nb::object(pos_info_in_tok.attr("utf8_col")));
  }
  const Position* place = pos_info_in_tok.is_none() ? nullptr : &in_token;
  if (LineObject* object = LineOrNull(logical)) {
    LogicalLine& line = object->line();
    const Context where = line.token_count == 0 ? Context::Index(0) : ErrorContext(context);
    return ExceptionFor(CreateSyntaxError(std::string(message.text()), line, where, place));
  }
  // Any object with the three fields.
  LogicalLine line;
  line.token_count = Int32Of(nb::object(logical.attr("fTokenCount")));
  Context where = Context::Index(0);
  if (line.token_count != 0) {
    where = ErrorContext(context);
    if (where.IsIndex()) {
      line.HoldSource(SourceOfTokens(TupleOf(nb::object(logical.attr("fToks")))));
      line.toks = line.source->tokens;
      line.SetPositions(PositionsOf(TupleOf(nb::object(logical.attr("fPositions")))));
    }
  }
  SyntaxError error = CreateSyntaxError(std::string(message.text()), line, where, place);
  nb::object text = nb::module_::import_("quillet.logicalinspect").attr("TextFromTokens")(logical);
  error.text = HostText::FromStr(text).text();
  return ExceptionFor(error);
}

}  // namespace

void BindAnalysis(nb::module_& tarvex) {
  nb::class_<AnalyzerObject, AnalyzerBase> cls(
      tarvex, "CPGenAnalyzerImpl", "Analyses logical lines, one at a time; one analyzer serves one thread.");
  cls.def("__init__", &InitAnalyzer, nb::arg("version_triple"), nb::arg("grammar_file") = kPy3DefaultGrammar,
          nb::arg("keyword_seq") = nb::none(), nb::arg("py3_grammar") = true,
          nb::arg("hint_grammar_file") = kPy3DefaultGrammar);
  DefOperation(cls, "AnalyzeSingleLogical", &Analyze, nb::arg("logical"), nb::arg("in_async_def"),
               nb::arg("first_in_def") = false,
               "Analyses a line once and gives the exception that describes a failure, or None.");
  g_bound_analyze = nb::object(cls.attr("AnalyzeSingleLogical")).release().ptr();
  cls.attr("AnalyzeSingleLogical") =
      nb::steal(PyDescr_NewMethod(reinterpret_cast<PyTypeObject*>(cls.ptr()), &kAnalyzeSingleLogical));
  DefOperation(cls, "_InspectSingleLogical", &Inspect, nb::arg("logical"), nb::arg("in_async_def"),
               nb::arg("in_embedded_expression") = false, nb::arg("first_in_def") = false,
               "Parses and walks a line; raises what AnalyzeSingleLogical returns.");
  DefOperation(cls, "_InspectEmbeddedExpressions", &InspectEmbedded, nb::arg("logical"), nb::arg("node"),
               nb::arg("in_async_def"), nb::arg("first_in_def"),
               "Inspects the line's embedded expressions and copies their records up.");
  DefOperation(
      cls, "ParseToNode",
      [](AnalyzerObject& self, Any logical, Truth in_async_def) {
        return ForwardParseToNode(self.LookInto().logical_parser(), logical, in_async_def);
      },
      nb::arg("logical"), nb::arg("in_async_def"));
  DefOperation(
      cls, "ParseTokenListToNode",
      [](AnalyzerObject& self, Any logical, Truth in_async_def) {
        return ForwardParseTokenListToNode(self.LookInto().logical_parser(), logical, in_async_def);
      },
      nb::arg("logical"), nb::arg("in_async_def"));
  DefOperation(
      cls, "GetTypeParameterNodes",
      [](AnalyzerObject& self, Any toks) {
        return ForwardGetTypeParameterNodes(self.LookInto().logical_parser(), toks);
      },
      nb::arg("toks"));
  cls.def_prop_ro("_fLogicalParser", [](AnalyzerObject& self) {
    if (!self.logical_parser.is_valid()) {
      self.logical_parser =
          NewParserObject(std::shared_ptr<CPGenParserImpl>(self.analyzer, &self.LookInto().logical_parser()),
                          self.version_triple, self.keywords);
    }
    return self.logical_parser;
  });
  cls.def_prop_ro("_fNodeWalker", [](AnalyzerObject& self) {
    if (!self.node_walker.is_valid())
      self.node_walker = NewWalkerObject(std::shared_ptr<CNodeWalker>(self.analyzer, &self.LookInto().node_walker()));
    return self.node_walker;
  });
  cls.def_prop_ro("_fTypeHintWalker", [](nb::handle self) {
    auto& object = nb::cast<AnalyzerObject&>(self);
    if (!object.type_hint_walker.is_valid()) {
      object.type_hint_walker =
          NewHintWalkerObject(std::shared_ptr<CTypeHintWalker>(object.analyzer, &object.LookInto().type_hint_walker()),
                              nb::object(self.attr("_fNodeWalker")), object.version_triple);
    }
    return object.type_hint_walker;
  });

  DefOperation(tarvex, "CreateSyntaxError", &SyntaxErrorFor, nb::arg("msg"), nb::arg("logical"), nb::arg("context"),
               nb::arg("pos_info_in_tok") = nb::none(), "The SyntaxError for a place in a logical line.");
}

}  // namespace quillet::host
