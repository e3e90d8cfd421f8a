// Runs the passes over a grammar text, and settles what its names and quoted texts stand for.
#include "grammar/grammar.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <utility>

#include "foundations/errors.h"
#include "grammar/automaton.h"
#include "grammar/first_sets.h"
#include "grammar/grammar_text.h"
#include "grammar/tables.h"

namespace quillet {
namespace {

constexpr size_t kMaxLabels = Grammar::kNoLabel;
constexpr size_t kMaxRules = 0xFFFF - Grammar::kFirstSymbol;

bool IsKeywordText(const std::string& text) {
  const auto is_letter = [](char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_'; };
  return is_letter(text[0]) &&
         std::all_of(text.begin(), text.end(), [&](char c) { return is_letter(c) || (c >= '0' && c <= '9'); });
}

bool LooksLikeTokenName(const std::string& name) {
  return std::none_of(name.begin(), name.end(), [](char c) { return c >= 'a' && c <= 'z'; });
}

// A grammar that is kept. The list is only ever prolonged, without a lock: one that a thread holds while the
// process forks would be held for ever in the other process.
struct KeptGrammar {
  std::string filename;
  std::string text;
  TokenNames names;
  std::shared_ptr<const Grammar> grammar;
  const KeptGrammar* before;
};
constinit std::atomic<const KeptGrammar*> latest_grammar{nullptr};
// Those of the package are three.
constexpr int kMostKeptGrammars = 8;
constinit std::atomic<int> kept_grammar_count{0};

std::string ReadFile(const std::string& filename) {
  const auto fail = [&](int error) {
    ThrowError(ErrorKind::kOSError, "cannot read grammar file '" + filename + "': " + std::strerror(error));
  };
  std::FILE* file = std::fopen(filename.c_str(), "rb");
  if (file == nullptr) fail(errno);
  std::string text;
  char block[1 << 14];
  size_t length;
  while ((length = std::fread(block, 1, sizeof block, file)) > 0) text.append(block, length);
  const int error = std::ferror(file) ? errno : 0;
  std::fclose(file);
  if (error != 0) fail(error);
  return text;
}

}  // namespace

const TokenNames& TokenNames::Default() {
  // For threads that the end of the process overtakes, too.
  static const TokenNames& names = *[] {
    auto* made = new TokenNames;
    const auto add_operator = [&](const char* text, int number) {
      if (text[0] != '\0') made->op2number.emplace(text, number);
    };
#define QUILLET_TOKEN(name, number, text)   \
  made->name2number.emplace(#name, number); \
  add_operator(text, number);
#define QUILLET_TOKEN_ALIAS(name, number, text) add_operator(text, number);
#include "tokens/token_ids.def"
    return made;
  }();
  return names;
}

Grammar Grammar::Parse(Text text, const std::string& filename, const TokenNames& names) {
  const pgen::GrammarSource source{filename};
  const std::vector<pgen::RuleText> rule_texts = pgen::ReadRules(text, source);

  Grammar grammar;
  if (rule_texts.size() > kMaxRules) source.Fail(rule_texts.back().line, "too many rules");
  for (const pgen::RuleText& rule : rule_texts) {
    grammar.symbol2number.emplace(rule.name, kFirstSymbol + static_cast<int>(grammar.symbol_names.size()));
    grammar.symbol_names.push_back(rule.name);
  }
  if (const auto name = names.name2number.find("NAME"); name != names.name2number.end()) {
    grammar.name_type_ = name->second;
  }

  const auto new_label = [&](const pgen::Expression& expression, Label label) {
    if (grammar.labels.size() == kMaxLabels) source.Fail(expression.line, "too many kinds of tokens");
    grammar.labels.push_back(std::move(label));
    return static_cast<LabelId>(grammar.labels.size() - 1);
  };
  const auto label_of_token = [&](const pgen::Expression& expression, int type, std::string spelling) {
    const auto known = grammar.token_labels_.find(type);
    if (known != grammar.token_labels_.end()) return static_cast<int>(known->second);
    const LabelId label = new_label(expression, {type, {}, std::move(spelling)});
    grammar.token_labels_.emplace(type, label);
    return static_cast<int>(label);
  };
  const auto label_of_keyword = [&](const pgen::Expression& expression) {
    const auto known = grammar.keyword_labels_.find(expression.text);
    if (known != grammar.keyword_labels_.end()) return static_cast<int>(known->second);
    const LabelId label = new_label(expression, {grammar.name_type_, expression.text, "'" + expression.text + "'"});
    grammar.keyword_labels_.emplace(expression.text, label);
    return static_cast<int>(label);
  };

  for (const pgen::RuleText& rule : rule_texts) {
    const pgen::LabelOf label_of = [&](const pgen::Expression& expression) {
      const std::string& name = expression.text;
      if (expression.kind == pgen::Expression::Kind::kQuoted) {
        if (IsKeywordText(name)) return label_of_keyword(expression);
        const auto number = names.op2number.find(name);
        if (number != names.op2number.end()) return label_of_token(expression, number->second, "'" + name + "'");
        source.Fail(expression.line, "rule '" + rule.name + "': no operator is written '" + name + "'");
      }
      if (const auto symbol = grammar.symbol2number.find(name); symbol != grammar.symbol2number.end()) {
        return symbol->second;
      }
      if (const auto number = names.name2number.find(name); number != names.name2number.end()) {
        return label_of_token(expression, number->second, name);
      }
      source.Fail(expression.line,
                  "rule '" + rule.name +
                      "': " + (LooksLikeTokenName(name) ? "no token is named '" : "there is no rule '") + name + "'");
    };
    grammar.rules.push_back({rule.name, rule.line, pgen::BuildAutomaton(rule, label_of, source)});
  }
  grammar.tables_ = pgen::BuildTables(grammar, pgen::ComputeFirstSets(grammar, source), source);

  for (size_t code = 0; code < grammar.label_of_code.size(); ++code) {
    const auto known = grammar.token_labels_.find(TypeOfCode(static_cast<TokenCode>(code)));
    grammar.label_of_code[code] = known == grammar.token_labels_.end() ? kNoLabel : known->second;
  }
  for (const auto& [keyword, label] : grammar.keyword_labels_) {
    const TokenCode code = CodeOfName(keyword.data(), keyword.size());
    if (IsWordCode(code)) {
      grammar.label_of_code[code] = label;
    } else {
      grammar.other_keywords.emplace(keyword, label);
    }
  }
  return grammar;
}

Grammar Grammar::Load(const std::string& filename, const TokenNames& names) {
  return Parse(ReadFile(filename), filename, names);
}

std::shared_ptr<const Grammar> Grammar::Shared(const std::string& filename, const TokenNames& names) {
  const std::string text = ReadFile(filename);
  for (const KeptGrammar* kept = latest_grammar.load(std::memory_order_acquire); kept != nullptr; kept = kept->before) {
    if (kept->text == text && kept->filename == filename && kept->names == names) return kept->grammar;
  }
  auto made = std::make_shared<const Grammar>(Parse(text, filename, names));
  if (kept_grammar_count.load(std::memory_order_relaxed) < kMostKeptGrammars &&
      kept_grammar_count.fetch_add(1, std::memory_order_relaxed) < kMostKeptGrammars) {
    auto* const kept = new KeptGrammar{filename, text, names, made, latest_grammar.load(std::memory_order_relaxed)};
    while (!latest_grammar.compare_exchange_weak(kept->before, kept, std::memory_order_acq_rel)) {
    }
  }
  return made;
}

Grammar::LabelId Grammar::Classify(int type, Text value) const {
  if (type == name_type_ && !IsNone(value)) {
    const auto keyword = keyword_labels_.find(std::string(value));
    if (keyword != keyword_labels_.end()) return keyword->second;
  }
  const auto token = token_labels_.find(type);
  return token == token_labels_.end() ? kNoLabel : token->second;
}

}  // namespace quillet
