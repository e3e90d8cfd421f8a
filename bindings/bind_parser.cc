// CPGenAnalyzer (the interface), CPGenParserImpl, and the grammar files' names.
#include <limits>
#include <span>

#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/errors.h"
#include "bindings/host_call.h"
#include "bindings/line_object.h"
#include "bindings/matchcase_object.h"
#include "bindings/node_ref.h"
#include "bindings/parser_object.h"
#include "parser/parser.h"

namespace quillet::host {
namespace {

constexpr const char* kTheParser = "the parser";

PyObject* g_builtin_convert = nullptr;  // CPGenParserImpl.convert

// An optpgen.Parser of the host's whose converter is a Python subclass with a convert of its own.
class HostEngine final : public ExternalEngine {
 public:
  // The owner holds the host's parser, too, and shows it to the collector.
  HostEngine(ParserObject& owner, nb::handle parser) : owner_(owner), parser_(parser) {}

  void Setup(int start) override {
    root_.reset();
    CallingHost([&] { parser_.attr("setup")(start); });
  }
  void AddToken(int type, Text value, int32_t context) override {
    CallingHost([&] { parser_.attr("addtoken")(type, StrOf(value), context); });
  }
  CNode* Finish() override {
    return CallingHost([&] {
      root_ = parser_.attr("finish")();
      if (PyTuple_Check(root_.ptr())) return RecursiveConvert(owner_.parser->factory(), root_);
      return RefOf(root_).node();
    });
  }

 private:
  ParserObject& owner_;
  nb::handle parser_;
  nb::object root_;  // keeps the wrapper until the caller has its own
};

nb::object& MadeOnce(nb::object& slot, nb::object (*make)(ParserObject&), ParserObject& self) {
  if (!slot.is_valid()) slot = make(self);
  return slot;
}

nb::object MakeGrammar(ParserObject& self) {
  return nb::cast(GrammarObject{std::shared_ptr<const Grammar>(self.parser, &self.parser->grammar())});
}
nb::object MakeFactory(ParserObject& self) {
  return NewFactoryObject(std::shared_ptr<CNodeFactory>(self.parser, &self.parser->factory()), self.keywords);
}
nb::object MakeClsForStateList(ParserObject& self) {
  nb::list list;
  for (NodeKind kind : self.parser->kinds_for_states()) list.append(ClassOfKind(kind));
  return list;
}
nb::object GrammarOf(ParserObject& self) { return MadeOnce(self.grammar, &MakeGrammar, self); }

// The engine as the host sees it: one that calls the parser object's convert.
nb::object NewEngine(ParserObject& self, nb::handle converter) {
  return nb::module_::import_("quillet.optpgen")
      .attr("CreateParser")(GrammarOf(self), converter, nb::arg("promotesinglechild") = true);
}

nb::object EngineOf(nb::handle self) {
  auto& object = nb::cast<ParserObject&>(self);
  if (!object.engine.is_valid()) object.engine = NewEngine(object, self);
  return object.engine;
}

// Has a parser feed an engine while this lives.
class FeedingEngine {
 public:
  FeedingEngine(ParserObject& object, ExternalEngine& engine) : object_(object) {
    object_.parser->set_external_engine(&engine);
  }
  ~FeedingEngine() { object_.parser->set_external_engine(object_.external.get()); }
  FeedingEngine(const FeedingEngine&) = delete;
  FeedingEngine& operator=(const FeedingEngine&) = delete;

 private:
  ParserObject& object_;
};

void InitParser(nb::pointer_and_handle<ParserObject> self, Any version_triple, Any grammar_file, Any keyword_seq,
                Truth py3_grammar) {
  auto* object = new (self.p) ParserObject();
  try {
    CPGenParserImpl::Options options;
    ReadOptions(options, version_triple, grammar_file, keyword_seq, object->keywords);
    options.py3_grammar = py3_grammar;
    object->version_triple = nb::borrow(version_triple);
    object->parser = std::make_shared<CPGenParserImpl>(options);
    nb::object convert = self.h.type().attr("convert");
    if (!convert.is(g_builtin_convert)) {
      object->engine = NewEngine(*object, self.h);
      object->external = std::make_unique<HostEngine>(*object, object->engine);
      object->parser->set_external_engine(object->external.get());
    }
  } catch (...) {
    object->~ParserObject();
    throw;
  }
}

// ---- parsing ----

// Runs an operation of the parser that makes nodes from a source.
template <class Parse>
nb::object Parsed(CPGenParserImpl& parser, const Ref<SourceText>& source, Parse&& parse) {
  const OneThread use(parser.thread_use, kTheParser);
  PinSource(parser.factory().pool(), source.get());
  return Wrap(parse(), source);
}

nb::object ParseToNode(CPGenParserImpl& parser, nb::handle logical, bool in_async_def) {
  LogicalLine& line = LineOf(logical).line();
  const Ref<SourceText> source = line.source;  // an override of convert may put another one in its place
  return Parsed(parser, source, [&] { return parser.ParseToNode(line, in_async_def); });
}

CNode* ParseToks(CPGenParserImpl& parser, TokenSpan toks, bool in_async_def, const PositionView* positions) {
  if (positions != nullptr) return parser.ParseToksToNode(toks, in_async_def, *positions);
  CNode* node = parser.ParseSpecialCases(toks, in_async_def, PositionView());
  return node != nullptr ? node : parser.ParseToksToNodeImpl(toks, in_async_def, nullptr);
}

nb::object ParseTokenListToNode(CPGenParserImpl& parser, nb::handle toks, bool in_async_def) {
  if (!toks.is_none() && !PyList_Check(toks.ptr())) ThrowExpected("list", toks);
  TokensArg tokens(toks);
  return Parsed(parser, tokens.source, [&] { return parser.ParseTokenListToNode(tokens.toks(), in_async_def); });
}

nb::object GetTypeParameterNodes(CPGenParserImpl& parser, nb::handle toks) {
  TokensArg tokens(toks);
  const OneThread use(parser.thread_use, kTheParser);
  PinSource(parser.factory().pool(), tokens.source.get());
  return WrapList(parser.GetTypeParameterNodes(tokens.toks()), tokens.source);
}

// A special case: an operation on tokens, positions and the index of a token.
template <CNode* (CPGenParserImpl::*Operation)(TokenSpan, bool, const PositionView&, int64_t)>
nb::object SpecialCase(ParserObject& self, Any toks, Truth in_async_def, Any positions, Any tok_i) {
  TokensArg tokens(toks);
  PositionsArg places(positions);
  const int64_t index = Int64Of(tok_i);
  return Parsed(*self.parser, tokens.source,
                [&] { return (self.parser.get()->*Operation)(tokens.toks(), in_async_def, places.Required(), index); });
}

void BindFeeding(nb::class_<ParserObject, AnalyzerBase>& cls) {
  DefOperation(
      cls, "ParseToNode",
      [](ParserObject& self, Any logical, Truth in_async_def) {
        return ParseToNode(*self.parser, logical, in_async_def);
      },
      nb::arg("logical"), nb::arg("in_async_def"),
      "The tree of a logical line, or None for one without tokens to parse. It goes back through DiscardNode.");
  DefOperation(
      cls, "ParseToksToNode",
      [](ParserObject& self, Any toks, Truth in_async_def, Any positions) {
        TokensArg tokens(toks);
        PositionsArg places(positions);
        return Parsed(*self.parser, tokens.source,
                      [&] { return ParseToks(*self.parser, tokens.toks(), in_async_def, places.view()); });
      },
      nb::arg("toks"), nb::arg("in_async_def"), nb::arg("positions"),
      "The tree of tokens: special cases first, then the grammar.");
  DefOperation(
      cls, "_ParseToksToNodeImpl",
      [](ParserObject& self, Any toks, Truth in_async_def, Any positions) {
        TokensArg tokens(toks);
        PositionsArg places(positions);
        return Parsed(*self.parser, tokens.source,
                      [&] { return self.parser->ParseToksToNodeImpl(tokens.toks(), in_async_def, places.view()); });
      },
      nb::arg("toks"), nb::arg("in_async_def"), nb::arg("positions"));
  DefOperation(
      cls, "ParseTokenListToNode",
      [](ParserObject& self, Any toks, Truth in_async_def) {
        return ParseTokenListToNode(*self.parser, toks, in_async_def);
      },
      nb::arg("toks"), nb::arg("in_async_def"), "The tree of tokens without positions; no special cases.");
  DefOperation(
      cls, "convert",
      [](ParserObject& self, Any type, Any value, Any context, Any children) {
        return ConvertSingleNode(self.parser->factory(), type, value, context, children);
      },
      nb::arg("type"), nb::arg("value"), nb::arg("context"), nb::arg("children"));
  DefOperation(
      cls, "DiscardNode", [](ParserObject& self, Any node) { self.parser->DiscardNode(NodeOrNull(node)); },
      nb::arg("node"), "Gives a tree back for reuse.");
  DefOperation(
      cls, "_AddTokenList",
      [](nb::handle self, Any tok_list, Any context) {
        auto& object = nb::cast<ParserObject&>(self);
        TokensArg tokens(tok_list);
        const int32_t index = Int32Of(context);
        const OneThread use(object.parser->thread_use, kTheParser);
        PinSource(object.parser->factory().pool(), tokens.source.get());
        // To the engine that the host sets up and finishes.
        HostEngine engine(object, EngineOf(self));
        const FeedingEngine feeding(object, engine);
        object.parser->AddTokenList(tokens.toks(), index);
      },
      nb::arg("tok_list"), nb::arg("context"));
  DefOperation(
      cls, "_ShouldSkipSlash",
      [](ParserObject&, Any tok_i, Any positions) {
        PositionsArg places(positions);
        return CPGenParserImpl::ShouldSkipSlash(Int64Of(tok_i), places.view());
      },
      nb::arg("tok_i"), nb::arg("positions"));
  DefOperation(
      cls, "_FindNextNonSkipIndex",
      [](ParserObject&, Any toks, Any tok_i) {
        TokensArg tokens(toks);
        return CPGenParserImpl::FindNextNonSkipIndex(tokens.toks(), Int64Of(tok_i));
      },
      nb::arg("toks"), nb::arg("tok_i"));
  DefOperation(
      cls, "_FindPrevNonSkipIndex",
      [](ParserObject&, Any toks, Any tok_i) {
        TokensArg tokens(toks);
        return CPGenParserImpl::FindPrevNonSkipIndex(tokens.toks(), Int64Of(tok_i));
      },
      nb::arg("toks"), nb::arg("tok_i"));
  DefOperation(
      cls, "_NonNestedFindTokenIndex",
      [](ParserObject&, Any tok, Any toks, Any start, Any end) {
        const HostText wanted = HostText::FromStr(tok);
        TokensArg tokens(toks);
        return CPGenParserImpl::NonNestedFindTokenIndex(wanted.text(), tokens.toks(), Int64Of(start), Int64Of(end));
      },
      nb::arg("tok"), nb::arg("toks"), nb::arg("start"), nb::arg("end"));
  DefOperation(
      cls, "_RaiseParseError", [](ParserObject& self, Any context) { self.parser->RaiseParseError(Int64Of(context)); },
      nb::arg("context"));
}

void BindSpecialCases(nb::class_<ParserObject, AnalyzerBase>& cls) {
  DefOperation(
      cls, "_ParseSpecialCases",
      [](ParserObject& self, Any toks, Truth in_async_def, Any positions) {
        TokensArg tokens(toks);
        PositionsArg places(positions);
        return Parsed(*self.parser, tokens.source,
                      [&] { return self.parser->ParseSpecialCases(tokens.toks(), in_async_def, places.Required()); });
      },
      nb::arg("toks"), nb::arg("in_async_def"), nb::arg("positions"));
  const auto def_case = [&cls](const char* name, auto operation) {
    DefOperation(cls, name, operation, nb::arg("toks"), nb::arg("in_async_def"), nb::arg("positions"),
                 nb::arg("tok_i"));
  };
  def_case("_ParseSpecialCaseParenthesizedWith", &SpecialCase<&CPGenParserImpl::ParseSpecialCaseParenthesizedWith>);
  def_case("_ParseSpecialCaseExceptStar", &SpecialCase<&CPGenParserImpl::ParseSpecialCaseExceptStar>);
  def_case("_ParseSpecialCaseWithTypeParameter", &SpecialCase<&CPGenParserImpl::ParseSpecialCaseWithTypeParameter>);
  DefOperation(
      cls, "_NodesForTypeParameters",
      [](ParserObject& self, Any toks, Truth in_async_def, Any positions, Any start, Any end, Truth raise_errors) {
        TokensArg tokens(toks);
        PositionsArg places(positions);
        const OneThread use(self.parser->thread_use, kTheParser);
        PinSource(self.parser->factory().pool(), tokens.source.get());
        return WrapList(self.parser->NodesForTypeParameters(tokens.toks(), in_async_def, places.view(), Int64Of(start),
                                                            Int64Of(end), raise_errors),
                        tokens.source);
      },
      nb::arg("toks"), nb::arg("in_async_def"), nb::arg("positions"), nb::arg("start"), nb::arg("end"),
      nb::arg("raise_errors"));
  DefOperation(
      cls, "_CreateSingleTypeParameterNode",
      [](ParserObject& self, Any toks, Truth in_async_def, Any positions, Any start, Any end, Truth raise_errors) {
        TokensArg tokens(toks);
        PositionsArg places(positions);
        return Parsed(*self.parser, tokens.source, [&] {
          return self.parser->CreateSingleTypeParameterNode(tokens.toks(), in_async_def, places.view(), Int64Of(start),
                                                            Int64Of(end), raise_errors);
        });
      },
      nb::arg("toks"), nb::arg("in_async_def"), nb::arg("positions"), nb::arg("start"), nb::arg("end"),
      nb::arg("raise_errors"));
  DefOperation(
      cls, "GetTypeParameterNodes",
      [](ParserObject& self, Any toks) { return GetTypeParameterNodes(*self.parser, toks); }, nb::arg("toks"),
      "The type parameters that a line defines, whether or not the rest of it parses.");
}

void BindFields(nb::class_<ParserObject, AnalyzerBase>& cls) {
  cls.def_prop_ro("_fGrammar", &GrammarOf);
  cls.def_prop_ro("_fPy3Grammar", [](ParserObject& self) { return self.parser->py3_grammar(); });
  cls.def_prop_ro("_fFileInputNumber", [](ParserObject& self) { return self.parser->file_input_number(); });
  cls.def_prop_ro("_fKeywords", [](ParserObject& self) { return self.keywords; });
  cls.def_prop_ro("_fParser", &EngineOf);
  cls.def_prop_ro("_fNodeFactory", [](ParserObject& self) { return MadeOnce(self.node_factory, &MakeFactory, self); });
  cls.def_prop_ro("_fClsForStateList",
                  [](ParserObject& self) { return MadeOnce(self.cls_for_state_list, &MakeClsForStateList, self); });
  cls.def_prop_ro("_fVersionTriple", [](ParserObject& self) { return self.version_triple; });
  cls.def_prop_ro("_fAsyncAlwaysKeyword", [](ParserObject& self) { return self.parser->async_always_keyword(); });
  cls.def_prop_ro("_fMatchCaseStatementParser", [](nb::handle self) {
    auto& object = nb::cast<ParserObject&>(self);
    if (!object.match_case_parser.is_valid()) {
      object.match_case_parser = NewMatchcaseObject(
          std::shared_ptr<CMatchCaseStatementParser>(object.parser, &object.parser->match_case_parser()), self);
    }
    return object.match_case_parser;
  });
  DefOperation(cls, "_BuildClsForStateList", &MakeClsForStateList);
  nb::dict cls_for_state;
  for (const auto& [name, kind] : KindsByStateName()) cls_for_state[StrOf(name)] = ClassOfKind(kind);
  cls.attr("kClsForState") = cls_for_state;
}

// A parser and what it made refer to each other.
int TraverseParser(PyObject* self, visitproc visit, void* arg) {
  Py_VISIT(Py_TYPE(self));
  if (!nb::inst_ready(self)) return 0;
  ParserObject* object = nb::inst_ptr<ParserObject>(self);
  Py_VISIT(object->engine.ptr());
  Py_VISIT(object->match_case_parser.ptr());
  return 0;
}

int ClearParser(PyObject* self) {
  ParserObject* object = nb::inst_ptr<ParserObject>(self);
  object->DropEngine();
  nb::object engine = std::move(object->engine);
  nb::object match_case_parser = std::move(object->match_case_parser);
  return 0;
}

const PyType_Slot kParserSlots[] = {{Py_tp_traverse, reinterpret_cast<void*>(TraverseParser)},
                                    {Py_tp_clear, reinterpret_cast<void*>(ClearParser)},
                                    {0, nullptr}};

}  // namespace

void BindParser(nb::module_& tarvex) {
  tarvex.attr("kPy2DefaultGrammar") = kPy2DefaultGrammar;
  tarvex.attr("kPy3DefaultGrammar") = kPy3DefaultGrammar;

  nb::class_<AnalyzerBase, NodeConverter> base(tarvex, "CPGenAnalyzer",
                                               "Analyses a logical line with a parser built on grammar tables.");
  base.def(nb::init<>());
  DefOperation(
      base, "AnalyzeSingleLogical",
      [](AnalyzerBase&, Any, Any, Any) { ThrowError(ErrorKind::kNotImplementedError, ""); }, nb::arg("logical"),
      nb::arg("in_async_def"), nb::arg("first_in_def") = false);

  nb::class_<ParserObject, AnalyzerBase> cls(tarvex, "CPGenParserImpl", nb::type_slots(kParserSlots),
                                             "Turns the tokens of one logical line into a tree of nodes.");
  cls.def("__init__", &InitParser, nb::arg("version_triple"), nb::arg("grammar_file") = kPy3DefaultGrammar,
          nb::arg("keyword_seq") = nb::none(), nb::arg("py3_grammar") = true);
  BindFields(cls);
  BindFeeding(cls);
  BindSpecialCases(cls);
  g_builtin_convert = nb::object(cls.attr("convert")).ptr();  // kept by the class

  DefOperation(
      tarvex, "NextNonRemovedTokenInTuple",
      [](Any toks, Any i) {
        TokensArg tokens(toks);
        const Token* token = NextNonRemovedTokenInTuple(tokens.toks(), Int64Of(i));
        return token == nullptr ? nb::object(nb::none()) : StrOfToken(*token);
      },
      nb::arg("toks"), nb::arg("i"), "The first token from `i` on that is neither a comment nor a backslash, or None.");
}

// Operations that the analyzer forwards to its parser.
nb::object ForwardParseToNode(CPGenParserImpl& parser, nb::handle logical, bool in_async_def) {
  return ParseToNode(parser, logical, in_async_def);
}
nb::object ForwardParseTokenListToNode(CPGenParserImpl& parser, nb::handle toks, bool in_async_def) {
  return ParseTokenListToNode(parser, toks, in_async_def);
}
nb::object ForwardGetTypeParameterNodes(CPGenParserImpl& parser, nb::handle toks) {
  return GetTypeParameterNodes(parser, toks);
}

}  // namespace quillet::host
