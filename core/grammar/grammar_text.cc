// Reads pgen notation by recursive descent: choice, sequence, item, and an item's repetition.
//
// The line end is a symbol of the notation only outside brackets, so the scanner counts them.
// Brackets nest to a fixed depth, which bounds the descent here and in every pass over the result.
#include "grammar/grammar_text.h"

#include <unordered_map>
#include <utility>

#include "foundations/errors.h"

namespace quillet::pgen {
namespace {

constexpr int kMaxBrackets = 100;

bool IsWordByte(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

class Reader {
 public:
  Reader(Text text, const GrammarSource& source) : text_(text), source_(source) {
    if (text_.starts_with("\xEF\xBB\xBF")) text_.remove_prefix(3);
    Advance();
  }

  std::vector<RuleText> ReadAll() {
    std::vector<RuleText> rules;
    std::unordered_map<std::string, int> line_of_rule;
    for (;;) {
      while (symbol_ == Symbol::kLineEnd) Advance();
      if (symbol_ == Symbol::kEnd) break;
      RuleText rule = ReadRule();
      const auto [known, is_new] = line_of_rule.emplace(rule.name, rule.line);
      if (!is_new) {
        source_.Fail(rule.line, "rule '" + rule.name + "' is already defined in line " + std::to_string(known->second));
      }
      rules.push_back(std::move(rule));
    }
    if (rules.empty()) source_.Fail(line_, "no rule in the grammar");
    return rules;
  }

 private:
  enum class Symbol : uint8_t { kName, kQuoted, kPunctuation, kLineEnd, kEnd };

  RuleText ReadRule() {
    if (symbol_ != Symbol::kName) Fail("expected the name of a rule, not " + Found());
    rule_name_ = spelling_;
    const int line = line_;
    Advance();
    if (!Is(':')) Fail("expected ':' after the name, not " + Found());
    Advance();
    Expression body = ReadChoice();
    if (symbol_ != Symbol::kLineEnd && symbol_ != Symbol::kEnd) Fail("expected the end of the rule, not " + Found());
    return {std::exchange(rule_name_, {}), line, std::move(body)};
  }

  Expression ReadChoice() {
    Expression first = ReadSequence();
    if (!Is('|')) return first;
    Expression choice{Expression::Kind::kChoice, first.line, {}, {}};
    choice.parts.push_back(std::move(first));
    while (Is('|')) {
      Advance();
      choice.parts.push_back(ReadSequence());
    }
    return choice;
  }

  Expression ReadSequence() {
    Expression sequence{Expression::Kind::kSequence, line_, {}, {}};
    while (symbol_ == Symbol::kName || symbol_ == Symbol::kQuoted || Is('(') || Is('[')) {
      sequence.parts.push_back(ReadItem());
    }
    if (sequence.parts.empty()) Fail("expected a name, a quoted text, '(' or '[', not " + Found());
    return sequence;
  }

  Expression ReadItem() {
    if (Is('[')) return Wrap(Expression::Kind::kOptional, ReadBracket(']'));
    Expression item;
    if (Is('(')) {
      item = ReadBracket(')');
    } else {
      const auto kind = symbol_ == Symbol::kName ? Expression::Kind::kName : Expression::Kind::kQuoted;
      item = {kind, line_, spelling_, {}};
      Advance();
    }
    if (!Is('*') && !Is('+')) return item;
    const auto kind = Is('*') ? Expression::Kind::kAnyNumber : Expression::Kind::kOneOrMore;
    Advance();
    return Wrap(kind, std::move(item));
  }

  Expression ReadBracket(char closing) {
    const std::string opening = spelling_;
    const int opening_line = line_;
    if (++brackets_ > kMaxBrackets) Fail("brackets are nested too deep");
    Advance();
    Expression inner = ReadChoice();
    if (symbol_ == Symbol::kEnd) {
      source_.Fail(opening_line, "rule '" + rule_name_ + "': '" + opening + "' is never closed");
    }
    if (!Is(closing)) {
      Fail("expected '" + std::string(1, closing) + "' for the '" + opening + "' of line " +
           std::to_string(opening_line) + ", not " + Found());
    }
    --brackets_;
    Advance();
    return inner;
  }

  static Expression Wrap(Expression::Kind kind, Expression part) {
    Expression whole{kind, part.line, {}, {}};
    whole.parts.push_back(std::move(part));
    return whole;
  }

  bool Is(char punctuation) const { return symbol_ == Symbol::kPunctuation && spelling_[0] == punctuation; }

  // Steps to the next symbol of the notation.
  void Advance() {
    line_ = next_line_;
    for (; pos_ < text_.size(); ++pos_) {
      const char c = text_[pos_];
      if (c == '#') {
        while (pos_ + 1 < text_.size() && text_[pos_ + 1] != '\n') ++pos_;
      } else if (c == '\n' && brackets_ > 0) {
        line_ = ++next_line_;
      } else if (c != ' ' && c != '\t' && c != '\r' && c != '\f') {
        break;
      }
    }
    if (pos_ == text_.size()) {
      symbol_ = Symbol::kEnd;
      return;
    }
    const size_t start = pos_;
    const char c = text_[pos_++];
    if (c == '\n') {
      symbol_ = Symbol::kLineEnd;
      ++next_line_;
    } else if (IsWordByte(c)) {
      while (pos_ < text_.size() && IsWordByte(text_[pos_])) ++pos_;
      symbol_ = Symbol::kName;
      spelling_ = text_.substr(start, pos_ - start);
    } else if (c == '\'' || c == '"') {
      while (pos_ < text_.size() && text_[pos_] != c && text_[pos_] != '\n') ++pos_;
      spelling_ = text_.substr(start + 1, pos_ - start - 1);
      if (pos_ == text_.size() || text_[pos_] != c) Fail("the quote before '" + spelling_ + "' is never closed");
      ++pos_;
      if (spelling_.empty()) Fail("a quoted text is empty");
      symbol_ = Symbol::kQuoted;
    } else {
      symbol_ = Symbol::kPunctuation;
      spelling_ = c;
      if (Text(":|()[]*+").find(c) == Text::npos) {
        while (pos_ < text_.size() && (text_[pos_] & 0xC0) == 0x80) spelling_ += text_[pos_++];
        Fail(ReprOfText(spelling_) + " has no meaning in a grammar");
      }
    }
  }

  std::string Found() const {
    switch (symbol_) {
      case Symbol::kEnd:
        return "the end of the file";
      case Symbol::kLineEnd:
        return "the end of the line";
      case Symbol::kName:
      case Symbol::kQuoted:
      case Symbol::kPunctuation:
        break;
    }
    return "'" + spelling_ + "'";
  }

  [[noreturn]] void Fail(const std::string& message) const {
    source_.Fail(line_, rule_name_.empty() ? message : "rule '" + rule_name_ + "': " + message);
  }

  Text text_;
  const GrammarSource& source_;
  size_t pos_ = 0;
  int next_line_ = 1;      // of the text at pos_
  int brackets_ = 0;       // open ones
  std::string rule_name_;  // of the rule being read

  Symbol symbol_ = Symbol::kEnd;  // the one to be taken next, with its line and spelling
  int line_ = 1;
  std::string spelling_;
};

}  // namespace

void GrammarSource::Fail(int line, const std::string& message) const {
  ThrowError(ErrorKind::kGrammarError, filename + ":" + std::to_string(line) + ": " + message);
}

std::vector<RuleText> ReadRules(Text text, const GrammarSource& source) { return Reader(text, source).ReadAll(); }

}  // namespace quillet::pgen
