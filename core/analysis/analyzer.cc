// The flow of one logical line: parse, walk, look into embedded expressions, give the tree back.
//
// A bad line costs its records and yields one error. What a failure becomes is decided by where it
// comes from: the parser's own errors are placed by the operation that knows the line they belong
// to, syntax errors pass as they are, and anything else from a walk is an internal failure, wrapped
// with the line's tokens and reported. The tree goes back on every way out.
#include "analysis/analyzer.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "analysis/closer_look.h"
#include "analysis/error_words.h"
#include "foundations/console.h"
#include "foundations/stop.h"
#include "lines/syntax_error.h"
#include "parser/complete_parser.h"

namespace quillet {

namespace {

CPGenParserImpl::Options ParserOptions(const CPGenAnalyzerImpl::Options& analyzer, const std::string& grammar_file,
                                       const std::vector<std::string>& keywords, bool py3_grammar) {
  CPGenParserImpl::Options options;
  options.version = analyzer.version;
  options.grammar_file = grammar_file;
  options.keywords = keywords;
  options.py3_grammar = py3_grammar;
  options.token_names = analyzer.token_names;
  options.kinds_by_state = analyzer.kinds_by_state;
  return options;
}

std::string JoinedTokens(const LogicalLine& logical) {
  std::string joined;
  for (size_t i = 0; i < logical.toks.size(); ++i) {
    if (logical.toks[i].removed()) {
      ThrowError(ErrorKind::kTypeError,
                 "sequence item " + std::to_string(i) + ": expected str instance, NoneType found");
    }
    if (i > 0) joined += ' ';
    joined += logical.toks[i].view();
  }
  return joined;
}

// What a walk failed with, as the error to go on with, or nothing where the host lets it pass. An
// exception of the host's that the host does not describe is none of ours to replace.
std::exception_ptr WrapWalkFailure(const std::exception_ptr& failure, const LogicalLine& logical) {
  try {
    std::rethrow_exception(failure);
  } catch (const SyntaxError&) {
    return failure;
  } catch (const Stopped&) {
    return failure;
  } catch (const Error&) {
  } catch (...) {
    if (TheConsole().describe_exception(failure).empty()) return failure;
  }
  const std::string message = "Could not analyze logical -- inner exception is " + ReprOfException(failure) +
                              "\n  logical tokens: " + JoinedTokens(logical);
  const auto replace_exception = TheConsole().replace_exception;
  return replace_exception != nullptr ? replace_exception(message, failure)
                                      : std::make_exception_ptr(Error(ErrorKind::kValueError, message));
}

const char* MessageForEmbedded(LineKind kind) {
  switch (kind) {
    case LineKind::kCommentedTypeHint:
      return "invalid syntax in commented type hint";
    case LineKind::kStringifiedTypeHint:
      return "invalid syntax in stringified type hint";
    default:
      return "invalid syntax";
  }
}

}  // namespace

CPGenAnalyzerImpl::CPGenAnalyzerImpl(const Options& options)
    : logical_parser_(std::make_unique<CPGenParserImpl>(
          ParserOptions(options, options.grammar_file, options.keywords, options.py3_grammar))),
      node_walker_(std::make_unique<CNodeWalker>(options.version)),
      type_hint_walker_(
          std::make_unique<CTypeHintWalker>(std::make_unique<CPGenParserImpl>(ParserOptions(
                                                options, options.hint_grammar_file, options.hint_keywords, true)),
                                            options.version, node_walker_.get())),
      version_(options.version) {
  if (!options.reads_completely) return;
  CPGenParserImpl& hint_parser = type_hint_walker_->hint_parser();
  const bool print_statement =
      !options.version.AtLeast(3, 0) && std::ranges::find(options.keywords, "print") != options.keywords.end();
  complete_parser_ =
      std::make_unique<CompleteParser>(hint_parser.factory(), hint_parser.grammar(), options.version, print_statement);
  closer_look_ = std::make_unique<CloserLook>(options.version);
  node_walker_->ReadCompletely();
  type_hint_walker_->ReadCompletely(complete_parser_.get());
}

CPGenAnalyzerImpl::~CPGenAnalyzerImpl() = default;

std::optional<SyntaxError> CPGenAnalyzerImpl::AnalyzeSingleLogical(LogicalLine& logical, bool in_async_def,
                                                                   bool first_in_def) {
  if (logical.parsed) return std::nullopt;
  // Before anything can fail, so that a line that failed is not analysed twice either.
  logical.SetParsed(true);
  try {
    logical.ClearDerivedInfo();
    InspectSingleLogical(logical, in_async_def, false, first_in_def);
    return std::nullopt;
  } catch (const ParseError& error) {
    logical.ClearDerivedInfo();
    const std::string message = explains_errors_ ? ExplainedSyntaxError(logical.toks, error) : "invalid syntax";
    return spells_error_texts_ ? CreateSyntaxError(message, logical, error.context)
                               : CreateTextlessSyntaxError(message, logical, error.context);
  } catch (const SyntaxError& error) {
    logical.ClearDerivedInfo();
    return error;
  } catch (const Stopped&) {
    // As if it had not begun.
    logical.ClearDerivedInfo();
    logical.SetParsed(false);
    throw;
  } catch (...) {
    const std::exception_ptr failure = std::current_exception();
    logical.ClearDerivedInfo();
    TheConsole().report_exception(failure, true);
    return std::nullopt;
  }
}

bool CPGenAnalyzerImpl::HasNoKeywordsOfItsOwn() const {
  const KeywordSet& keywords = logical_parser_->factory().keywords();
  return logical_parser_->grammar().other_keywords.empty() && keywords.others.empty() && !keywords.host_lookup;
}

bool CPGenAnalyzerImpl::WalkWithoutDoubt(LogicalLine& logical, bool in_async_def) {
  if (closer_look_ != nullptr && closer_look_->NeedsCompleteParser(logical)) return false;
  try {
    CNode* const node = logical_parser_->ParseToNode(logical, in_async_def);
    if (node == nullptr) return false;
    struct GiveBack {
      CNode* node;
      ~GiveBack() { node->pool->Reclaim(node); }
    } give_back{node};
    node_walker_->Walk(node, &logical);
    type_hint_walker_->Walk(node, &logical, /*first_in_def=*/false);
  } catch (const Error&) {
    return false;
  }
  return closer_look_ == nullptr || (!node_walker_->met_doubtful() && !type_hint_walker_->hint_error());
}

bool CPGenAnalyzerImpl::InspectSingleLogical(LogicalLine& logical, bool in_async_def, bool in_embedded_expression,
                                             bool first_in_def) {
  CNode* node = nullptr;
  if (logical.kind != LineKind::kComment) {
    node = logical_parser_->ParseToNode(logical, in_async_def);
    if (node == nullptr) return true;
  }
  std::exception_ptr failure;
  try {
    node_walker_->Walk(node, &logical);
    type_hint_walker_->Walk(node, &logical, first_in_def);
    const bool may_hold_expressions = logical.hooks != nullptr || !logical.no_embedded;
    if (may_hold_expressions && !in_embedded_expression)
      InspectEmbeddedExpressions(logical, in_async_def, first_in_def);
  } catch (...) {
    failure = std::current_exception();
  }
  if (failure) [[unlikely]] {
    try {
      failure = WrapWalkFailure(failure, logical);
    } catch (...) {
      failure = std::current_exception();
    }
  }
  if (node != nullptr) logical_parser_->DiscardNode(node);
  if (failure) [[unlikely]]
    std::rethrow_exception(failure);
  return true;
}

void CPGenAnalyzerImpl::InspectEmbeddedExpressions(LogicalLine& logical, bool in_async_def, bool first_in_def) {
  // A walk that meets a limit prints a line, which may run code of the host's.
  if (logical.hooks != nullptr || logical.has_stored_positions()) [[unlikely]] {
    const EmbeddedLines embedded = logical.GetExpLogicals();
    for (LogicalLine* exp : embedded.lines) InspectEmbedded(logical, *exp, in_async_def, first_in_def);
    return;
  }
  EmbeddedExpressions found(logical);
  LogicalLine exp;
  for (size_t i = 0; i < found.size(); ++i) {
    found.Show(i, exp);
    InspectEmbedded(logical, exp, in_async_def, first_in_def);
  }
}

void CPGenAnalyzerImpl::InspectEmbedded(LogicalLine& logical, LogicalLine& exp, bool in_async_def, bool first_in_def) {
  // The hint walker finds and parses these by itself.
  if (exp.kind == LineKind::kCommentedTypeHint) return;
  try {
    InspectSingleLogical(exp, in_async_def, true, first_in_def);
  } catch (const ParseError& error) {
    logical.ClearDerivedInfo();
    const char* message = MessageForEmbedded(exp.kind);
    const SyntaxError inner = CreateSyntaxError(message, exp, error.context);
    const int64_t line = static_cast<int64_t>(exp.first_line) - logical.first_line + inner.lineno - 1;
    const int64_t col = inner.offset - 1;
    // The message stands where a file name would, and the text is that of the expression alone.
    throw SyntaxError(message, message, line + 1, col + 1, inner.text);
  }
  exp.CopyTypeEquivsTo(logical);
}

}  // namespace quillet
