// The flow of one logical line that is read completely.
//
// The tables come first: what they take, and nothing makes doubtful, is all that most statements cost. The
// parser that knows every rule reads what they reject, what they are no match for, and what a walk fails
// over; of what is doubtful it only gives its verdict. Whatever is wrong with a hint stays with the hint.
#include <algorithm>

#include "analysis/analyzer.h"
#include "analysis/closer_look.h"
#include "foundations/console.h"
#include "foundations/stop.h"
#include "lines/syntax_error.h"
#include "parser/complete_parser.h"

namespace quillet {

namespace {

// A tree is no deeper than its statement has tokens; a deeper one is given back without the quick way's recursion.
constexpr size_t kTokensOfDeepTree = 900;

StatementPlace PlaceOfStatement(const LinePlace& place) {
  using Scope = StatementPlace::Scope;
  StatementPlace statement;
  statement.scope = place.in_async_def ? Scope::kAsyncFunction
                    : place.in_def     ? Scope::kFunction
                    : place.in_class   ? Scope::kClass
                                       : Scope::kModule;
  return statement;
}

bool HoldsBackslash(TokenSpan toks) {
  return std::any_of(toks.begin(), toks.end(),
                     [](const Token& token) { return token.view().find('\\') != Text::npos; });
}

// Beside those in strings.
bool HoldsHash(TokenSpan toks) {
  return std::any_of(toks.begin(), toks.end(), [](const Token& token) {
    return token.code != tok::STRING && token.view().find('#') != Text::npos;
  });
}

}  // namespace

std::optional<SyntaxError> CPGenAnalyzerImpl::AnalyzeCompletely(LogicalLine& logical, const LinePlace& place,
                                                                const TypingNames& typing, bool is_doubtful) {
  if (logical.parsed) return std::nullopt;
  logical.SetParsed(true);
  typing_ = &typing;
  hint_error_.reset();
  compile_error_.reset();
  rejection_.reset();
  was_rejected_ = true;
  try {
    InspectCompletely(logical, place, is_doubtful);
    if (rejection_) [[unlikely]] {
      logical.ClearDerivedInfo();
      return std::move(rejection_);
    }
    was_rejected_ = false;
    if (!compile_error_ && !hint_error_) [[likely]]
      return std::nullopt;
    return compile_error_ ? std::move(compile_error_) : std::move(hint_error_);
  } catch (const ParseError& error) {
    logical.ClearDerivedInfo();
    return ErrorAt(error.message(), logical, error.context);
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

SyntaxError CPGenAnalyzerImpl::ErrorAt(const std::string& message, const LogicalLine& logical, Context context) const {
  // What is missing at the end of a line is missing where the line ends.
  if (context.IsIndex() && context.value >= logical.token_count && logical.source && !logical.toks.empty()) {
    const char* at = logical.toks.back().end();
    if (logical.source->Holds(at)) {
      while (at < logical.source->end() && (*at == ' ' || *at == '\t')) ++at;
      Position place = logical.source->PositionOf(at);
      place.line -= logical.first_line;
      context = Context::At(place);
    }
  }
  return spells_error_texts_ ? CreateSyntaxError(message, logical, context)
                             : CreateTextlessSyntaxError(message, logical, context);
}

bool CPGenAnalyzerImpl::IsDoubtful(const LogicalLine& logical, const LinePlace& place) const {
  return closer_look_->IsDoubtful(logical, place);
}

void CPGenAnalyzerImpl::InspectCompletely(LogicalLine& logical, const LinePlace& place, bool is_doubtful) {
  if (logical.kind == LineKind::kComment) return WalkCompletely(nullptr, logical, place);
  const auto parse_completely = [&] {
    CNode* const parsed = complete_parser_->ParseStatement(logical, PlaceOfStatement(place));
    if (const auto& failure = complete_parser_->failure())
      rejection_ = ErrorAt(failure->message(), logical, failure->context);
    else if (const auto& postponed = complete_parser_->postponed())
      compile_error_ = ErrorAt(postponed->message(), logical, postponed->context);
    return parsed;
  };
  CNode* tree = nullptr;
  bool is_of_tables = !closer_look_->NeedsCompleteParser(logical);
  if (is_of_tables) {
    try {
      tree = logical_parser_->TryParseToNode(logical, place.in_async_def);
    } catch (const ParseError&) {
      // Of a shape that the tables do not see whole.
    }
    is_of_tables = tree != nullptr;
  }
  if (!is_of_tables) {
    tree = parse_completely();
    if (tree == nullptr) return;
    return WalkCompletely(tree, logical, place);
  }
  try {
    WalkCompletely(tree, logical, place);
    if (!node_walker_->met_doubtful() && !is_doubtful) [[likely]]
      return;
  } catch (const Error&) {
    // A shape that a walk does not take. The other tree has another, or there is none.
    logical.ClearDerivedInfo();
    hint_error_.reset();
    if (CNode* other = parse_completely()) WalkCompletely(other, logical, place);
    return;
  }
  if (CNode* verdict = parse_completely()) complete_parser_->factory().pool().Reclaim(verdict);
}

void CPGenAnalyzerImpl::WalkCompletely(CNode* tree, LogicalLine& logical, const LinePlace& place) {
  struct GiveBack {
    CNode* tree;
    ~GiveBack() {
      if (tree != nullptr) tree->pool->Reclaim(tree);
    }
  } give_back{tree};
  node_walker_->Walk(tree, &logical);
  const bool met_doubtful = node_walker_->met_doubtful();
  type_hint_walker_->in_class = place.in_class;
  type_hint_walker_->Walk(tree, &logical, place.first_in_def);
  if (const auto& error = type_hint_walker_->hint_error(); error && !hint_error_) hint_error_ = *error;
  // A template that the parser met last may be that of a statement before: then there is nothing to find.
  if (!logical.no_embedded || complete_parser_->met_template() || typing_->has_renamed_cast())
    InspectEmbeddedCompletely(logical, place);
  node_walker_->set_met_doubtful(met_doubtful);
  if (tree != nullptr) {
    // The quick way back has an end, and says so: it begins as far above it as there may be levels.
    if (logical.toks.size() >= kTokensOfDeepTree) return;
    give_back.tree = nullptr;
    FinishedWithNodeAtDepth(tree, -static_cast<int64_t>(logical.toks.size()));
  }
}

void CPGenAnalyzerImpl::InspectEmbeddedCompletely(LogicalLine& logical, const LinePlace& place) {
  EmbeddedExpressions found(logical, typing_);
  LogicalLine exp;
  for (size_t i = 0; i < found.size(); ++i) {
    found.Show(i, exp);
    // The hint walker finds and parses those in comments by itself.
    if (exp.kind == LineKind::kCommentedTypeHint) continue;
    try {
      if (exp.kind == LineKind::kStringifiedTypeHint) {
        InspectStringHint(exp);
      } else {
        InspectField(logical, exp, place);
      }
    } catch (const ParseError& error) {
      if (exp.kind != LineKind::kStringifiedTypeHint)
        throw ErrorInEmbedded(error.message(), logical, exp, error.context);
      if (!found.MayBeText(i) && !hint_error_)
        hint_error_ = ErrorInEmbedded("invalid syntax in stringified type hint", logical, exp, error.context);
      continue;
    }
    exp.CopyTypeEquivsTo(logical);
  }
}

void CPGenAnalyzerImpl::InspectStringHint(LogicalLine& exp) {
  CNode* const tree = complete_parser_->ParseHint(exp.toks);
  if (tree == nullptr) return;
  struct GiveBack {
    CNode* tree;
    ~GiveBack() { tree->pool->Reclaim(tree); }
  } give_back{tree};
  node_walker_->Walk(tree, &exp);
}

void CPGenAnalyzerImpl::InspectField(LogicalLine& logical, LogicalLine& exp, const LinePlace& place) {
  const auto parse_completely = [&] {
    CNode* const parsed = complete_parser_->ParseField(exp, PlaceOfStatement(place));
    if (const auto& postponed = complete_parser_->postponed(); postponed && !compile_error_)
      compile_error_ = ErrorInEmbedded(postponed->message(), logical, exp, postponed->context);
    return parsed;
  };
  const bool is_flat = !version_.AtLeast(3, 12);
  if (is_flat && HoldsBackslash(exp.toks))
    throw ParseError("f-string expression part cannot include a backslash", -1, kNoText, Context::Index(0));
  if (is_flat && HoldsHash(exp.toks))
    throw ParseError("f-string expression part cannot include '#'", -1, kNoText, Context::Index(0));
  CNode* tree = nullptr;
  bool is_of_tables = true;
  try {
    tree = logical_parser_->ParseToNode(exp, place.in_async_def);
  } catch (const ParseError&) {
    is_of_tables = false;
    tree = parse_completely();
  }
  if (tree == nullptr) return;
  struct GiveBack {
    CNode* tree;
    ~GiveBack() { tree->pool->Reclaim(tree); }
  } give_back{tree};
  node_walker_->Walk(tree, &exp);
  if (!is_of_tables || (!node_walker_->met_doubtful() && !closer_look_->IsDoubtful(exp, place))) return;
  if (CNode* verdict = parse_completely()) complete_parser_->factory().pool().Reclaim(verdict);
}

SyntaxError CPGenAnalyzerImpl::ErrorInEmbedded(const std::string& message, const LogicalLine& logical,
                                               const LogicalLine& exp, Context context) const {
  SyntaxError error = CreateTextlessSyntaxError(message, exp, context);
  error.lineno += static_cast<int64_t>(exp.first_line) - logical.first_line;
  if (spells_error_texts_) error.text = TextFromTokens(logical);
  return error;
}

}  // namespace quillet
