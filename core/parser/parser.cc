// Construction of a parser: the tables of a grammar file, the node class of every state, and how
// the engine takes a token by its code.
//
// All table work happens here, once; afterwards the class of a node is one index by state number
// and the label of a token one index by its code. A state that no table names gets plain CNode.
#include "parser/parser.h"

#include <algorithm>
#include <limits>
#include <string>

#include "foundations/errors.h"

namespace quillet {

namespace {

constexpr Text kPy3KeywordList[] = {"False",  "None",   "True",    "and",      "as",       "assert", "async",
                                    "await",  "break",  "class",   "continue", "def",      "del",    "elif",
                                    "else",   "except", "finally", "for",      "from",     "global", "if",
                                    "import", "in",     "is",      "lambda",   "nonlocal", "not",    "or",
                                    "pass",   "raise",  "return",  "try",      "while",    "with",   "yield"};
constexpr Text kPy27KeywordList[] = {"and",   "as",     "assert", "break", "class",   "continue", "def",  "del",
                                     "elif",  "else",   "except", "exec",  "finally", "for",      "from", "global",
                                     "if",    "import", "in",     "is",    "lambda",  "not",      "or",   "pass",
                                     "print", "raise",  "return", "try",   "while",   "with",     "yield"};
static_assert(std::size(kPy3KeywordList) == 35 && std::size(kPy27KeywordList) == 31);

struct StateRow {
  Text state;
  NodeKind kind;
};

// Written out: the states whose class lists no rule.
constexpr StateRow kStateRows[] = {
    {"NAME", NodeKind::kCNameLiteral},
    {"STRING", NodeKind::kCStringLiteral},
    {"NUMBER", NodeKind::kCNumberLiteral},
    {"with_stmt", NodeKind::kCWithStmt},
    {"with_item", NodeKind::kCWithItem},
    {"pass_stmt", NodeKind::kCPassStmt},
    {"expr_stmt", NodeKind::kCExprStmt},
    {"return_stmt", NodeKind::kCReturnStmt},
    {"power", NodeKind::kCPower},
    {"trailer", NodeKind::kCTrailer},
    {"atom", NodeKind::kCAtom},
    {"funcdef", NodeKind::kCFuncdefStmt},
    {"global_stmt", NodeKind::kCGlobalStmt},
    {"nonlocal_stmt", NodeKind::kCNonlocalStmt},
    {"factor", NodeKind::kCFactorExpr},
    {"lambdef", NodeKind::kCLambdaExpr},
    {"lambdef_nocond", NodeKind::kCLambdaExpr},
    {"parameters", NodeKind::kCParametersNode},
    {"typedargslist", NodeKind::kCDefiningArglistNode},
    {"varargslist", NodeKind::kCDefiningArglistNode},
    {"arglist", NodeKind::kCUsedArglistNode},
    {"argument", NodeKind::kCSingleUsedArgumentNode},
    {"classdef", NodeKind::kCClassdefStmt},
    {"for_stmt", NodeKind::kCForStmt},
    {"import_name", NodeKind::kCImportNamesStmt},
    {"import_from", NodeKind::kCFromImportStmt},
    {"comp_for", NodeKind::kCCompForNode},
    {"sync_comp_for", NodeKind::kCCompForNode},
    {"list_for", NodeKind::kCCompForNode},
};

struct RuleRow {
  NodeKind kind;
  Text rule;
};
constexpr RuleRow kRuleRows[] = {
#define QUILLET_NODE_RULE(name, rule) {NodeKind::k##name, rule},
#include "tree/node_kinds.def"
};

Text NameOfRule(Text rule) {
  Text name = rule.substr(0, rule.find(':'));
  while (!name.empty() && name.front() == ' ') name.remove_prefix(1);
  while (!name.empty() && name.back() == ' ') name.remove_suffix(1);
  return name;
}

// The name of each token number. Where two tokens share a number, the later declaration names it.
std::vector<Text> TokenNamesByNumber(const TokenNames& names, NodePool& pool) {
  std::vector<Text> by_number(Grammar::kFirstSymbol, kNoText);
  for (const auto& [name, number] : names.name2number)
    if (number >= 0 && number < Grammar::kFirstSymbol) by_number[number] = pool.Intern(name);
#define QUILLET_TOKEN(name, number, text) \
  if (names.name2number.contains(#name)) by_number[number] = #name;
#include "tokens/token_ids.def"
  return by_number;
}

}  // namespace

std::span<const Text> Py3Keywords() { return kPy3KeywordList; }
std::span<const Text> Py27Keywords() { return kPy27KeywordList; }

KindsByName KindsByStateName() {
  KindsByName kinds;
  for (const StateRow& row : kStateRows) kinds.emplace_back(row.state, row.kind);
  for (const RuleRow& row : kRuleRows) {
    const Text name = NameOfRule(row.rule);
    const auto known = std::find_if(kinds.begin(), kinds.end(), [&](const auto& entry) { return entry.first == name; });
    if (known != kinds.end())
      known->second = row.kind;
    else
      kinds.emplace_back(name, row.kind);
  }
  return kinds;
}

std::vector<NodeKind> BuildKindsForStates(const Grammar& grammar, const KindsByName& kinds_by_state) {
  std::vector<NodeKind> kinds(Grammar::kFirstSymbol + grammar.symbol_names.size(), NodeKind::kCNode);
  std::unordered_map<Text, NodeKind> by_name;
  for (const auto& [name, kind] : kinds_by_state) by_name[name] = kind;
  const auto bind = [&](size_t number, Text name) {
    const auto found = by_name.find(name);
    if (found != by_name.end()) kinds[number] = found->second;
  };
  bind(tok::NAME, "NAME");
  bind(tok::NUMBER, "NUMBER");
  bind(tok::STRING, "STRING");
  for (size_t i = 0; i < grammar.symbol_names.size(); ++i) bind(Grammar::kFirstSymbol + i, grammar.symbol_names[i]);
  return kinds;
}

CPGenParserImpl::CPGenParserImpl(const Options& options)
    : version_(options.version),
      py3_grammar_(options.py3_grammar),
      async_always_keyword_(options.version.AtLeast(3, 7)),
      grammar_(Grammar::Shared(options.grammar_file, options.token_names)) {
  const auto file_input = grammar_->symbol2number.find("file_input");
  if (file_input == grammar_->symbol2number.end()) ThrowError(ErrorKind::kKeyError, "file_input");
  file_input_number_ = file_input->second;
  kinds_for_states_ = BuildKindsForStates(*grammar_, options.kinds_by_state);

  Ref<NodePool> pool(new NodePool);
  const std::vector<Text> token_names = TokenNamesByNumber(options.token_names, *pool);
  std::vector<CNodeFactory::State> states;
  for (size_t i = 0; i < kinds_for_states_.size(); ++i) {
    const Text name =
        i < token_names.size() ? token_names[i] : pool->Intern(grammar_->symbol_names[i - Grammar::kFirstSymbol]);
    states.push_back({kinds_for_states_[i], name});
  }
  KeywordSet keywords;
  keywords.enabled = !options.keywords.empty();
  for (const std::string& keyword : options.keywords) keywords.Add(keyword);
  factory_ = std::make_unique<CNodeFactory>(pool, states, std::move(keywords), options.token_names.op2number);
  engine_ = std::make_unique<FactoryEngine>(*grammar_, FactoryBuilder{factory_.get()});
  match_case_parser_ = std::make_unique<CMatchCaseStatementParser>(this);
  BuildFeedTables();
}

CPGenParserImpl::~CPGenParserImpl() = default;

void CPGenParserImpl::BuildFeedTables() {
  FeedTable& plain = feed_tables_[false];
  plain.label = grammar_->label_of_code;
  for (int code = 0; code < 256; ++code)
    plain.type[code] = static_cast<uint8_t>(TypeOfCode(static_cast<TokenCode>(code)));
  // What is dropped, or spelt otherwise, is looked at outside of the fast path.
  plain.label[tok::COMMENT] = plain.label[tok::BACKSLASH] = plain.label[tok::REMOVED] = Grammar::kNoLabel;
  if (!py3_grammar_) plain.label[tok::ELLIPSIS] = Grammar::kNoLabel;
  if (!grammar_->other_keywords.empty()) plain.label[tok::NAME] = Grammar::kNoLabel;

  FeedTable& with_async = feed_tables_[true];
  with_async = plain;
  with_async.label[word::kAsync] = grammar_->label_of_code[tok::ASYNC];
  with_async.type[word::kAsync] = tok::ASYNC;
  with_async.label[word::kAwait] = grammar_->label_of_code[tok::AWAIT];
  with_async.type[word::kAwait] = tok::AWAIT;
}

void CPGenParserImpl::RaiseParseError(int64_t context) const {
  constexpr int64_t kLeast = std::numeric_limits<int32_t>::min();
  constexpr int64_t kMost = std::numeric_limits<int32_t>::max();
  const auto index = static_cast<int32_t>(std::clamp(context, kLeast, kMost));
  throw ParseError("syntax error", -1, kNoText, Context::Index(index));
}

}  // namespace quillet
