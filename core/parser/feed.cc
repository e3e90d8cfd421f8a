// The general feed: the tokens of one logical line, made acceptable to a grammar of whole files.
//
// Comments and continuing backslashes are dropped. A clause that cannot stand alone gets the
// statement it belongs to in front (`else` an `if`, `except` a `try`), a head without a body gets
// `pass`, a decorator a function; the wrappers of the file and of that function are taken off the
// result again. A token's context is its index in the line, and the invented ones have that of the
// first token or, at the end, the token count, so that errors point into the line.
//
// This is the innermost loop of the analysis of a file: the label of a token is one lookup by its
// code. Only the first token, and the few codes without a label, get a closer look.
#include <algorithm>

#include "foundations/errors.h"
#include "foundations/stop.h"
#include "parser/parser.h"

namespace quillet {

namespace {

constexpr Token Word(const char* text, uint32_t length, TokenCode code) { return {text, length, code}; }

constexpr Token kColon = Word(":", 1, tok::COLON);
constexpr Token kDef = Word("def", 3, word::kDef);
constexpr Token kDot = Word(".", 1, tok::DOT);
constexpr Token kFinally = Word("finally", 7, word::kFinally);
constexpr Token kFunction = Word("function", 8, tok::NAME);
constexpr Token kIf = Word("if", 2, word::kIf);
constexpr Token kLeftParen = Word("(", 1, tok::LPAR);
constexpr Token kNewline = Word("\n", 1, tok::NEWLINE);
constexpr Token kPass = Word("pass", 4, word::kPass);
constexpr Token kRightParen = Word(")", 1, tok::RPAR);
constexpr Token kTry = Word("try", 3, word::kTry);
constexpr Token kZero = Word("0", 1, tok::NUMBER);
constexpr Token kNoToken = Token{};

constexpr Token kTryInFront[] = {kTry, kColon, kPass, kNewline};
constexpr Token kIfInFront[] = {kIf, kZero, kColon, kPass, kNewline};
constexpr Token kDecorated[] = {kNewline, kDef, kFunction, kLeftParen, kRightParen, kColon, kPass};
constexpr Token kTryBehind[] = {kNewline, kFinally, kColon, kPass};
constexpr Token kEllipsisAsDots[] = {kDot, kDot, kDot};

// The two engines that take tokens: the parser's own, by label, and one of the host's, by type.
struct OwnEngine {
  FactoryEngine& engine;

  void Setup(int start) { engine.Setup(start); }
  void Add(Grammar::LabelId label, int type, const Token& token, int32_t context) {
    engine.AddToken(label, type, token, context);
  }
  CNode* Finish() { return engine.Finish(); }
};
struct HostEngine {
  ExternalEngine& engine;

  void Setup(int start) { engine.Setup(start); }
  void Add(Grammar::LabelId, int type, const Token& token, int32_t context) {
    engine.AddToken(type, token.view(), context);
  }
  CNode* Finish() { return engine.Finish(); }
};

template <class TokenEngine>
void AddAll(TokenEngine& engine, const Grammar& grammar, TokenSpan toks, int32_t context) {
  for (const Token& token : toks) engine.Add(grammar.label_of_code[token.code], TypeOfCode(token.code), token, context);
}

}  // namespace

CNode* CPGenParserImpl::ParseToksToNode(TokenSpan toks, bool in_async_def, const PositionView& positions) {
  return ParseRun({toks}, in_async_def, positions);
}

CNode* CPGenParserImpl::ParseToksToNodeImpl(TokenSpan toks, bool in_async_def, const PositionView* positions) {
  return ParseRunImpl({toks}, in_async_def, positions);
}

CNode* CPGenParserImpl::ParseRun(TokenRun run, bool in_async_def, const PositionView& positions) {
  CNode* special = SpecialCases(run, in_async_def, positions);
  return special != nullptr ? special : ParseRunImpl(run, in_async_def, &positions);
}

CNode* CPGenParserImpl::TryParseToNode(const LogicalLine& logical, bool in_async_def) {
  const PositionView positions = logical.positions();
  if (CNode* special = SpecialCases({logical.toks}, in_async_def, positions)) return special;
  struct Quiet {
    FactoryEngine& engine;
    explicit Quiet(FactoryEngine& used) : engine(used) { engine.set_is_quiet(true); }
    ~Quiet() { engine.set_is_quiet(false); }
  } quiet(*engine_);
  return ParseRunImpl({logical.toks}, in_async_def, &positions);
}

CNode* CPGenParserImpl::ParseRunImpl(TokenRun run, bool in_async_def, const PositionView* positions) {
  const bool async_keyword = async_always_keyword_ || in_async_def;
  if (external_engine_ != nullptr) [[unlikely]] {
    HostEngine engine{*external_engine_};
    return Feed(engine, run, async_keyword, positions);
  }
  OwnEngine engine{*engine_};
  return Feed(engine, run, async_keyword, positions);
}

void CPGenParserImpl::AddTokenList(TokenSpan toks, int32_t context) {
  if (external_engine_ != nullptr) {
    HostEngine engine{*external_engine_};
    return AddAll(engine, *grammar_, toks, context);
  }
  OwnEngine engine{*engine_};
  AddAll(engine, *grammar_, toks, context);
}

template <class TokenEngine>
CNode* CPGenParserImpl::Feed(TokenEngine& engine, TokenRun run, bool async_keyword, const PositionView* positions) {
  const FeedTable& table = feed_tables_[async_keyword];
  const Token* toks = run.toks.data();
  const int64_t count = run.count();

  int64_t i = 0;
  const auto is_dropped = [&](int64_t at) {
    const TokenCode code = toks[at].code;
    return code == tok::COMMENT || code == tok::REMOVED ||
           (code == tok::BACKSLASH && ShouldSkipSlash(run.IndexOf(at), positions));
  };
  while (i < count && is_dropped(i)) ++i;
  if (i == count) return nullptr;

  constexpr int64_t kStepsOfAStatement = 16;  // however short it is
  CountSteps(kStepsOfAStatement + std::min(count, kStepsBetweenQuestions));
  engine.Setup(file_input_number_);

  // The first token decides what is invented around the statement.
  const Token* first = &toks[i];
  const int32_t first_index = run.IndexOf(i);
  bool is_decorator = false;
  bool is_lone_async = false;
  switch (first->code) {
    case word::kElif:
      first = &kIf;
      break;
    case word::kExcept:
    case word::kFinally:
      AddAll(engine, *grammar_, kTryInFront, first_index);
      break;
    case word::kElse:
      AddAll(engine, *grammar_, kIfInFront, first_index);
      break;
    case word::kAsync:
      if (!async_keyword) {
        const Token* next = NextNonRemovedTokenInTuple(run.toks, i + 1);
        is_lone_async = next != nullptr && next->code == word::kDef;
      }
      break;
    case tok::AT:
      is_decorator = true;
      break;
    default:
      break;
  }

  // The code of the last token that was fed as itself; it tells whether a body is missing.
  TokenCode last_code = tok::REMOVED;
  if (is_lone_async) {
    engine.Add(grammar_->label_of_code[tok::ASYNC], tok::ASYNC, *first, first_index);
    last_code = first->code;
    ++i;
  } else if (first != &toks[i]) {
    engine.Add(table.label[first->code], table.type[first->code], *first, first_index);
    last_code = first->code;
    ++i;
  }
  last_code = FeedRest(engine, run, i, last_code, table, positions);

  const int32_t end_index = run.IndexOf(count);
  const bool lacks_body = last_code == tok::COLON;
  if (first->code == word::kTry) {
    if (lacks_body) AddAll(engine, *grammar_, {&kPass, 1}, end_index);
    AddAll(engine, *grammar_, kTryBehind, end_index);
  } else if (is_decorator) {
    AddAll(engine, *grammar_, kDecorated, end_index);
  } else if (lacks_body) {
    AddAll(engine, *grammar_, {&kPass, 1}, end_index);
  }
  engine.Add(grammar_->label_of_code[tok::NEWLINE], tok::NEWLINE, kNewline, end_index);
  engine.Add(grammar_->label_of_code[tok::ENDMARKER], tok::ENDMARKER, kNoToken, end_index);
  return Unwrap(engine.Finish(), is_decorator);
}

// The tokens from `i` on; gives the code of the last one fed as itself. All that a plain token takes is
// inlined here.
template <class TokenEngine>
[[gnu::flatten]] TokenCode CPGenParserImpl::FeedRest(TokenEngine& engine, TokenRun run, int64_t i, TokenCode last_code,
                                                     const FeedTable& table, const PositionView* positions) {
  const int64_t count = run.count();
  while (true) {
    const int64_t end = std::min(count, i + kStepsBetweenQuestions);
    for (; i < end; ++i) {
      const Token& token = run.toks[i];
      const Grammar::LabelId label = table.label[token.code];
      if (label == Grammar::kNoLabel) [[unlikely]] {
        if (FeedUnusual(engine, run, i, table, positions)) last_code = token.code;
        continue;
      }
      engine.Add(label, table.type[token.code], token, run.IndexOf(i));
      last_code = token.code;
    }
    if (i == count) return last_code;
    CountSteps(kStepsBetweenQuestions);
  }
}

// A token without a label of its own: dropped, spelt otherwise, looked up by its text, or given to
// the engine, which rejects it. True if it was fed as itself.
template <class TokenEngine>
[[gnu::noinline]] bool CPGenParserImpl::FeedUnusual(TokenEngine& engine, TokenRun run, int64_t i,
                                                    const FeedTable& table, const PositionView* positions) {
  const Token& token = run.toks[i];
  const int32_t index = run.IndexOf(i);
  Grammar::LabelId label = Grammar::kNoLabel;
  switch (token.code) {
    case tok::REMOVED:
    case tok::COMMENT:
      return false;
    case tok::BACKSLASH:
      if (ShouldSkipSlash(index, positions)) return false;
      break;
    case tok::ELLIPSIS:
      // Three tokens to the older grammar.
      if (!py3_grammar_) {
        AddAll(engine, *grammar_, kEllipsisAsDots, index);
        return false;
      }
      break;
    case tok::NAME: {
      const auto keyword = grammar_->other_keywords.find(std::string(token.view()));
      label = keyword != grammar_->other_keywords.end() ? keyword->second : grammar_->label_of_code[tok::NAME];
      break;
    }
    default:
      break;
  }
  engine.Add(label, table.type[token.code], token, index);
  return true;
}

// Takes the wrappers off: that of the file, whose children are the statement and the end marker, and
// for a decorator the node that also holds the invented function.
CNode* CPGenParserImpl::Unwrap(CNode* root, bool is_decorator) {
  if (root == nullptr) return nullptr;
  const CNode* end = root->Child(1);
  if (root->ChildCount() != 2 || end == nullptr || end->fClsInfo == nullptr ||
      end->fClsInfo->fNodeType != tok::ENDMARKER) {
    factory_->DiscardNodes(root);
    return nullptr;
  }
  CNode* stmt = factory_->PopChild(root, 0);
  factory_->DiscardNodes(root);
  if (!is_decorator || stmt->ChildCount() != 2) return stmt;
  CNode* decorator = factory_->PopChild(stmt, 0);
  factory_->DiscardNodes(stmt);
  return decorator;
}

bool CPGenParserImpl::ShouldSkipSlash(int64_t tok_i, const PositionView* positions) {
  if (positions == nullptr) return true;
  const int64_t count = static_cast<int64_t>(positions->size());
  if (tok_i < 0 || tok_i >= count) return false;
  if (tok_i + 1 == count) return true;
  return positions->LineOf(tok_i + 1) > positions->LineOf(tok_i);
}

}  // namespace quillet
