// CPGenParserImpl turns the tokens of one logical line into a CNode tree.
//
// Construction is expensive (tables from a grammar file, the class of every state) and is done once
// a Python version; parsing is cheap. A statement goes first to the special cases (special_cases.cc:
// statements newer than the tables, rewritten by blanking tokens so that no index moves), then to
// the general feed (feed.cc: what is dropped, rewritten and invented so that the grammar of a whole
// file accepts a lone statement head).
//
// A tree belongs to whoever asked for it and goes back once, through DiscardNode. Failures are
// ParseErrors with a token index; `toks.size()` means after the last token. Whatever was built
// before a failure is given back here.
#pragma once

#include <array>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "foundations/thread_use.h"
#include "grammar/grammar.h"
#include "lines/logical_line.h"
#include "parser/factory_engine.h"
#include "parser/match_case_parser.h"
#include "tree/factory.h"
#include "tree/nodes.h"

namespace quillet {

inline constexpr const char* kPy2DefaultGrammar = "Python-Grammar-2.7";
inline constexpr const char* kPy3DefaultGrammar = "Python-Grammar-3.8";

// The class of each state that has one of its own, by the state's name: the written-out table and the
// rules of node_kinds.def.
using KindsByName = std::vector<std::pair<std::string, NodeKind>>;
KindsByName KindsByStateName();

// The default keyword lists: those of Python 3 and of 2.7.
std::span<const Text> Py3Keywords();
std::span<const Text> Py27Keywords();

// Bounds of type parameters that hold type parameters of their own: a deeper one is a ParseError at
// its colon.
inline constexpr int kMaxBoundDepth = 40;

// An engine of the host's, used where a Python subclass overrides `convert`.
class ExternalEngine {
 public:
  virtual ~ExternalEngine() = default;
  virtual void Setup(int start) = 0;
  virtual void AddToken(int type, Text value, int32_t context) = 0;
  virtual CNode* Finish() = 0;
};

class CPGenParserImpl {
 public:
  struct Options {
    Version version;
    std::string grammar_file;  // an absolute path: resolving is the caller's
    std::vector<std::string> keywords;
    bool py3_grammar = true;
    TokenNames token_names = TokenNames::Default();
    KindsByName kinds_by_state = KindsByStateName();
  };

  explicit CPGenParserImpl(const Options& options);
  CPGenParserImpl(const CPGenParserImpl&) = delete;
  CPGenParserImpl& operator=(const CPGenParserImpl&) = delete;
  ~CPGenParserImpl();

  // ---- feeding (feed.cc) ----
  CNode* ParseToNode(const LogicalLine& logical, bool in_async_def) {
    return ParseToksToNode(logical.toks, in_async_def, logical.positions());
  }
  // Null: nothing is left to parse.
  CNode* ParseToksToNode(TokenSpan toks, bool in_async_def, const PositionView& positions);
  // `positions` null: a caller without position information.
  CNode* ParseToksToNodeImpl(TokenSpan toks, bool in_async_def, const PositionView* positions);
  CNode* ParseTokenListToNode(TokenSpan toks, bool in_async_def) {
    return ParseToksToNodeImpl(toks, in_async_def, nullptr);
  }
  void DiscardNode(CNode* node) { factory_->DiscardNodes(node); }
  // Feeds each token with the type of its own text and the same context.
  void AddTokenList(TokenSpan toks, int32_t context);
  // True for a backslash that continues the line: the next token begins on a later one.
  static bool ShouldSkipSlash(int64_t tok_i, const PositionView* positions);

  // ---- finding (find.cc) ----
  // Index of the first significant token after (before) `tok_i`, toks.size() without one.
  static int64_t FindNextNonSkipIndex(TokenSpan toks, int64_t tok_i);
  static int64_t FindPrevNonSkipIndex(TokenSpan toks, int64_t tok_i);
  // Index of the token with this text at nesting depth 0, or -1. TypeError for a removed token.
  static int64_t NonNestedFindTokenIndex(Text tok, TokenSpan toks, int64_t start, int64_t end);

  // ---- special cases (special_cases.cc) ----
  CNode* ParseSpecialCases(TokenSpan toks, bool in_async_def, const PositionView& positions);
  CNode* ParseSpecialCaseParenthesizedWith(TokenSpan toks, bool in_async_def, const PositionView& positions,
                                           int64_t tok_i);
  CNode* ParseSpecialCaseExceptStar(TokenSpan toks, bool in_async_def, const PositionView& positions, int64_t tok_i);
  CNode* ParseSpecialCaseWithTypeParameter(TokenSpan toks, bool in_async_def, const PositionView& positions,
                                           int64_t tok_i);
  // `positions` null as GetTypeParameterNodes has it: a bound is then a TypeError.
  NodeList NodesForTypeParameters(TokenSpan toks, bool in_async_def, const PositionView* positions, int64_t start,
                                  int64_t end, bool raise_errors);
  CNode* CreateSingleTypeParameterNode(TokenSpan toks, bool in_async_def, const PositionView* positions, int64_t start,
                                       int64_t end, bool raise_errors);
  NodeList GetTypeParameterNodes(TokenSpan toks);

  // ParseToNode without an exception where the tables reject a statement: null for that, too. ParseError for one
  // that they do not see whole.
  CNode* TryParseToNode(const LogicalLine& logical, bool in_async_def);

  [[noreturn]] void RaiseParseError(int64_t context) const;

  const Grammar& grammar() const { return *grammar_; }
  CNodeFactory& factory() const { return *factory_; }
  CMatchCaseStatementParser& match_case_parser() const { return *match_case_parser_; }
  const Version& version() const { return version_; }
  bool async_always_keyword() const { return async_always_keyword_; }
  bool py3_grammar() const { return py3_grammar_; }
  int file_input_number() const { return file_input_number_; }
  // The class of each state, by number: token numbers and grammar symbols.
  const std::vector<NodeKind>& kinds_for_states() const { return kinds_for_states_; }
  void set_external_engine(ExternalEngine* engine) { external_engine_ = engine; }

  // For a host whose threads take turns: who is in the middle of a parse.
  ThreadUse thread_use;

 private:
  // Part of a statement's tokens and the index of its first one: what stands in front of it counts
  // as removed, without a copy that says so.
  struct TokenRun {
    TokenSpan toks;
    int64_t base = 0;  // as wide as what it is copied with

    int64_t count() const { return static_cast<int64_t>(toks.size()); }
    int32_t IndexOf(int64_t i) const { return static_cast<int32_t>(base + i); }
  };
  // How the engine takes a token, by code; one table where async and await are names, one where
  // they are keywords. kNoLabel: a token that needs a closer look.
  struct FeedTable {
    std::array<Grammar::LabelId, 256> label;
    std::array<uint8_t, 256> type;
  };
  // Copies of token lists for rewriting, kept for reuse; statements nest, so there may be several.
  struct Scratch {
    std::vector<std::vector<Token>> buffers;
    size_t used = 0;
  };
  class TokenCopy;

  void BuildFeedTables();
  CNode* ParseRun(TokenRun run, bool in_async_def, const PositionView& positions);
  CNode* ParseRunImpl(TokenRun run, bool in_async_def, const PositionView* positions);
  template <class TokenEngine>
  CNode* Feed(TokenEngine& engine, TokenRun run, bool async_keyword, const PositionView* positions);
  template <class TokenEngine>
  TokenCode FeedRest(TokenEngine& engine, TokenRun run, int64_t i, TokenCode last_code, const FeedTable& table,
                     const PositionView* positions);
  template <class TokenEngine>
  bool FeedUnusual(TokenEngine& engine, TokenRun run, int64_t i, const FeedTable& table, const PositionView* positions);
  CNode* Unwrap(CNode* root, bool is_decorator);

  CNode* SpecialCases(TokenRun run, bool in_async_def, const PositionView& positions);
  CNode* ParenthesizedWith(TokenRun run, bool in_async_def, const PositionView& positions, int64_t tok_i);
  CNode* ExceptStar(TokenRun run, bool in_async_def, const PositionView& positions, int64_t tok_i);
  CNode* WithTypeParameter(TokenRun run, bool in_async_def, const PositionView& positions, int64_t tok_i);
  NodeList TypeParameters(TokenRun run, bool in_async_def, const PositionView* positions, int64_t start, int64_t end,
                          bool raise_errors);
  CNode* SingleTypeParameter(TokenRun run, bool in_async_def, const PositionView* positions, int64_t start, int64_t end,
                             bool raise_errors);
  CNode* TypeParameterBound(TokenRun run, bool in_async_def, const PositionView* positions, int64_t colon_i,
                            int64_t end, bool raise_errors);

  Version version_;
  bool py3_grammar_;
  bool async_always_keyword_;
  std::shared_ptr<const Grammar> grammar_;
  int file_input_number_ = 0;
  std::vector<NodeKind> kinds_for_states_;
  std::unique_ptr<CNodeFactory> factory_;
  std::unique_ptr<FactoryEngine> engine_;
  ExternalEngine* external_engine_ = nullptr;
  std::unique_ptr<CMatchCaseStatementParser> match_case_parser_;
  FeedTable feed_tables_[2];
  Scratch scratch_;
  int bound_depth_ = 0;
};

// The class for each state number up to the grammar's last symbol; plain CNode for a state without a name.
std::vector<NodeKind> BuildKindsForStates(const Grammar& grammar, const KindsByName& kinds_by_state);

// The first token from `i` on whose first character is neither "\\" nor "#"; null at the end.
// TypeError for a removed token on the way, IndexError for an empty one.
const Token* NextNonRemovedTokenInTuple(TokenSpan toks, int64_t i);

}  // namespace quillet
