// First pass: the text of a grammar becomes rules.
//
// A rule is "name: right-hand side" up to the end of its line, where an open bracket takes the next
// line in; "#" begins a comment. What names and quoted texts stand for is not settled here: a name
// may be defined further down.
#pragma once

#include <string>
#include <vector>

#include "foundations/text.h"

namespace quillet::pgen {

// Where messages say the trouble is.
struct GrammarSource {
  std::string filename;

  // GrammarError "FILE:LINE: message".
  [[noreturn]] void Fail(int line, const std::string& message) const;
};

struct Expression {
  enum class Kind : uint8_t {
    kName,      // text: a rule or a class of tokens
    kQuoted,    // text without its quotes: a keyword or an operator
    kSequence,  // of at least one part
    kChoice,    // of at least two parts
    kOptional,  // one part, as are the next two
    kAnyNumber,
    kOneOrMore,
  };

  Kind kind;
  int line;
  std::string text;
  std::vector<Expression> parts;
};

struct RuleText {
  std::string name;
  int line;
  Expression body;
};

// The rules in the order of the text, no name twice and at least one.
std::vector<RuleText> ReadRules(Text text, const GrammarSource& source);

}  // namespace quillet::pgen
