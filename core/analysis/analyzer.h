// CPGenAnalyzerImpl: the place where a call enters. One logical line in; its records, or the one
// error that describes why there are none, out.
//
// It owns the statement parser and the two walkers. Nothing survives from one line to the next but
// grammar tables, free lists and walker settings. One thread at a time per analyzer; analyzers
// share nothing.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "foundations/errors.h"
#include "hints/hint_walker.h"
#include "lines/logical_line.h"
#include "lines/scopes.h"
#include "lines/typing_names.h"
#include "parser/parser.h"
#include "walker/walker.h"

namespace quillet {

class CloserLook;
class CompleteParser;

class CPGenAnalyzerImpl {
 public:
  struct Options {
    Version version;
    std::string grammar_file;  // absolute paths
    std::string hint_grammar_file;
    std::vector<std::string> keywords;
    std::vector<std::string> hint_keywords;
    bool py3_grammar = true;
    TokenNames token_names = TokenNames::Default();
    KindsByName kinds_by_state = KindsByStateName();
    // For AnalyzeCompletely.
    bool reads_completely = false;
  };

  explicit CPGenAnalyzerImpl(const Options& options);
  ~CPGenAnalyzerImpl();

  // Analyses a line once. The error that describes a failure, or nothing: success, a line that was
  // analysed before, or a failure that is no syntax error, which is reported to the console. Only
  // what a hook or the report raises leaves as an exception.
  std::optional<SyntaxError> AnalyzeSingleLogical(LogicalLine& logical, bool in_async_def, bool first_in_def = false);

  // The same for a host that wants what the version of Python has, no more and no less: a statement that the
  // tables do not take, or may take in error, is read by the parser that knows every rule, and its error is in
  // the language's own words. A hint that cannot be read is an error that leaves the statement its records.
  // Of an analyzer that was made for it.
  std::optional<SyntaxError> AnalyzeCompletely(LogicalLine& logical, const LinePlace& place, const TypingNames& typing,
                                               bool is_doubtful);
  // Whether such a line may be in error, for what its own tokens are, though the tables take it. Of a line that was
  // cut completely, what the cutter says of it comes first (LineRow::unusual).
  bool IsDoubtful(const LogicalLine& logical, const LinePlace& place) const;

  // True; throws ParseError, SyntaxError, or ValueError for anything else that went wrong.
  bool InspectSingleLogical(LogicalLine& logical, bool in_async_def, bool in_embedded_expression = false,
                            bool first_in_def = false);
  void InspectEmbeddedExpressions(LogicalLine& logical, bool in_async_def, bool first_in_def);
  // One of them.
  void InspectEmbedded(LogicalLine& logical, LogicalLine& exp, bool in_async_def, bool first_in_def);

  // ---- for statements that are told from others of their shape (statement_shapes.h) ----
  // Whether the words that the grammar and the keywords know are those of the language alone.
  bool HasNoKeywordsOfItsOwn() const;
  // Walks a line without embedded expressions, which nobody asked for and of which nothing is reported. False
  // where its analysis would fail, or would not end with the walks.
  bool WalkWithoutDoubt(LogicalLine& logical, bool in_async_def);

  // Whether returned errors carry the text of their line, which costs more than the analysis of a short
  // one: true unless nobody is going to show it.
  void set_spells_error_texts(bool spells) { spells_error_texts_ = spells; }

  // Whether returned errors say what the parser waited for (error_words.h) instead of "invalid syntax" alone.
  void set_explains_errors(bool explains) { explains_errors_ = explains; }

  // Whether the grammar rejected the statement that was read completely last.
  bool was_rejected() const { return was_rejected_; }
  // Of such a statement, by a position or the index of a token.
  SyntaxError ErrorAt(const std::string& message, const LogicalLine& logical, Context context) const;
  const CompleteParser& complete_parser() const { return *complete_parser_; }

  CPGenParserImpl& logical_parser() const { return *logical_parser_; }
  CNodeWalker& node_walker() const { return *node_walker_; }
  CTypeHintWalker& type_hint_walker() const { return *type_hint_walker_; }

 private:
  // Throws what the statement is rejected with.
  void InspectCompletely(LogicalLine& logical, const LinePlace& place, bool is_doubtful);
  // The walks of a tree, which is given back; null for a line of comments.
  void WalkCompletely(CNode* tree, LogicalLine& logical, const LinePlace& place);
  void InspectEmbeddedCompletely(LogicalLine& logical, const LinePlace& place);
  void InspectField(LogicalLine& logical, LogicalLine& exp, const LinePlace& place);
  void InspectStringHint(LogicalLine& exp);
  // A failure in an embedded expression, as one of the line that holds it.
  SyntaxError ErrorInEmbedded(const std::string& message, const LogicalLine& logical, const LogicalLine& exp,
                              Context context) const;

  std::unique_ptr<CPGenParserImpl> logical_parser_;
  std::unique_ptr<CNodeWalker> node_walker_;
  std::unique_ptr<CTypeHintWalker> type_hint_walker_;
  // Of an analyzer that reads completely.
  std::unique_ptr<CompleteParser> complete_parser_;
  std::unique_ptr<CloserLook> closer_look_;
  const TypingNames* typing_ = nullptr;  // of the statement under way
  // Errors that leave it its records: of a hint, the first one, and of what the compiler does not take.
  std::optional<SyntaxError> hint_error_;
  std::optional<SyntaxError> compile_error_;
  // The one that leaves it nothing.
  std::optional<SyntaxError> rejection_;
  bool was_rejected_ = false;
  const Version version_;
  bool spells_error_texts_ = true;
  bool explains_errors_ = false;
};

}  // namespace quillet
