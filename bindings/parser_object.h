// The objects behind CPGenParserImpl and CPGenAnalyzerImpl, shared by the bindings that give out or
// take such objects.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "analysis/analyzer.h"
#include "analysis/statement_shapes.h"
#include "bindings/bindings.h"
#include "bindings/convert.h"
#include "bindings/optpgen_host.h"
#include "parser/parser.h"

namespace quillet::host {

// CPGenAnalyzer: the abstract interface.
struct AnalyzerBase : NodeConverter {};

// A parser of the host's making, or that of an analyzer or a hint walker, which it then keeps alive.
struct ParserObject : AnalyzerBase {
  ParserObject() = default;
  ParserObject(ParserObject&&) = default;
  ~ParserObject() { DropEngine(); }
  // The parser may outlive the object, but not with an engine of the object's.
  void DropEngine() {
    if (external) parser->set_external_engine(nullptr);
    external.reset();
  }

  std::shared_ptr<CPGenParserImpl> parser;
  nb::object version_triple;
  nb::object keywords;  // dict of text to None
  nb::object grammar;   // made when read, as are all of these
  nb::object engine;
  nb::object node_factory;
  nb::object cls_for_state_list;
  nb::object match_case_parser;
  std::unique_ptr<ExternalEngine> external;
};

struct AnalyzerObject : AnalyzerBase {
  std::shared_ptr<CPGenAnalyzerImpl> analyzer;
  // Statements are told from others of their shape as long as nothing of the analyzer but records was shown: nodes,
  // and what a parser and walkers keep from line to line, show which statements were really read.
  std::unique_ptr<StatementShapes> shapes;
  nb::object version_triple;
  nb::object keywords;
  nb::object logical_parser;  // made when read, as are the walkers
  nb::object node_walker;
  nb::object type_hint_walker;

  // For all that shows more than records.
  CPGenAnalyzerImpl& LookInto() {
    is_looked_into = true;
    return *analyzer;
  }
  bool is_looked_into = false;
};

// The absolute path of a grammar file: an absolute one as it stands, any other is one of the
// installation's resources, which quillet.config knows.
std::string ResolveGrammarFile(nb::handle grammar_file);

// The keywords of a sequence; None is the host's own list. `dict` becomes the set as the host sees it.
std::vector<std::string> KeywordList(nb::handle keyword_seq, nb::object& dict);

// What a parser reads of the host when it is made: the names of the tokens that _fastaccess declares, and
// the class of each state as CPGenParserImpl.kClsForState has it.
TokenNames HostTokenNames();
KindsByName HostKindsByState();

// Reads what parsers and analyzers are both made of; `keywords` becomes the set as the host sees it. What
// is wrong with the grammar file is told before anything that is wrong with the others.
template <class Options>
void ReadOptions(Options& options, nb::handle version_triple, nb::handle grammar_file, nb::handle keyword_seq,
                 nb::object& keywords) {
  options.grammar_file = ResolveGrammarFile(grammar_file);
  options.token_names = HostTokenNames();
  options.kinds_by_state = HostKindsByState();
  try {
    options.version = VersionOf(version_triple);
    options.keywords = KeywordList(keyword_seq, keywords);
  } catch (...) {
    Grammar::Load(options.grammar_file, options.token_names);
    throw;
  }
}

// A parser object around a parser that something else owns.
nb::object NewParserObject(std::shared_ptr<CPGenParserImpl> parser, nb::object version_triple, nb::object keywords);

// What an analyzer forwards to its parser.
nb::object ForwardParseToNode(CPGenParserImpl& parser, nb::handle logical, bool in_async_def);
nb::object ForwardParseTokenListToNode(CPGenParserImpl& parser, nb::handle toks, bool in_async_def);
nb::object ForwardGetTypeParameterNodes(CPGenParserImpl& parser, nb::handle toks);

// The tokens that an operation takes as `toks`: a tuple or a list of str and None.
struct TokensArg {
  explicit TokensArg(nb::handle toks);
  Ref<SourceText> source;
  TokenSpan toks() const { return source->tokens; }
};

// Positions of an operation: None, or a sequence of pairs.
struct PositionsArg {
  explicit PositionsArg(nb::handle positions);
  const PositionView* view() const { return is_none ? nullptr : &view_; }
  // For operations that index positions: TypeError for None.
  const PositionView& Required() const;

 private:
  bool is_none;
  std::vector<Position> positions_;
  PositionView view_;
};

}  // namespace quillet::host
