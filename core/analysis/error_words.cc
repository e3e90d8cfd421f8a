// One pass over the tokens in front of the place finds the open brackets, one over the rest what closes them.
#include "analysis/error_words.h"

#include <algorithm>
#include <array>
#include <vector>

#include "lines/token_search.h"

namespace quillet {

namespace {

constexpr Text kInvalidSyntax = "invalid syntax";

// The text of a token that has but one; empty for the others.
constexpr std::array<Text, 256> kTextOfCode = [] {
  std::array<Text, 256> texts{};
#define QUILLET_TOKEN(name, number, text) \
  if (texts[number].empty()) texts[number] = text;
#include "tokens/token_ids.def"
#define QUILLET_WORD(identifier, text) texts[word::k##identifier] = text;
#include "tokens/words.def"
  return texts;
}();

// ENDMARKER where nothing is open.
TokenCode ClosingOf(TokenCode opening) {
  switch (opening) {
    case tok::LPAR:
      return tok::RPAR;
    case tok::LSQB:
      return tok::RSQB;
    case tok::LBRACE:
      return tok::RBRACE;
    default:
      return tok::ENDMARKER;
  }
}

// The brackets that stand open behind some tokens, as indices of theirs.
class OpenBrackets {
 public:
  explicit OpenBrackets(TokenSpan toks) : toks_(toks) {}

  size_t count() const { return open_.size(); }
  // The innermost of those that open at `place` or in front of it; ENDMARKER without one.
  TokenCode InnermostUpTo(size_t place) const {
    const auto behind = std::upper_bound(open_.begin(), open_.end(), place);
    return behind == open_.begin() ? tok::ENDMARKER : toks_[*(behind - 1)].code;
  }
  // Whatever closes, closes the innermost one.
  void Pass(size_t i) {
    if (IsOpeningBracket(toks_[i].code)) open_.push_back(i);
    if (IsClosingBracket(toks_[i].code) && !open_.empty()) open_.pop_back();
  }

 private:
  TokenSpan toks_;
  std::vector<size_t> open_;
};

std::string Said(Text before, TokenCode code, Text behind) {
  return std::string(kInvalidSyntax).append(before).append("'").append(kTextOfCode[code]).append("'").append(behind);
}

}  // namespace

std::string ExplainedSyntaxError(TokenSpan toks, const ParseError& error) {
  std::string plain(kInvalidSyntax);
  if (!error.context.IsIndex() || error.context.value < 0) return plain;
  const size_t place = std::min(static_cast<size_t>(error.context.value), toks.size());
  const auto is_unreadable = [](const Token& token) { return token.code == tok::ERRORTOKEN; };
  if (std::any_of(toks.begin() + static_cast<ptrdiff_t>(place), toks.end(), is_unreadable)) return plain;

  OpenBrackets brackets(toks);
  for (size_t i = 0; i < place; ++i) brackets.Pass(i);
  const size_t around = brackets.count();
  const bool stands_at_closing = place < toks.size() && IsClosingBracket(toks[place].code);

  const TokenCode opening = brackets.InnermostUpTo(toks.size());
  // Up to the end of the innermost bracket around the place, or of the statement.
  bool needed_follows = false;
  bool is_closed = false;
  bool fits = true;  // what closes, to what is open
  for (size_t i = place; i < toks.size() && !is_closed; ++i) {
    if (brackets.count() == around && toks[i].code == error.needed) needed_follows = true;
    is_closed = brackets.count() == around && IsClosingBracket(toks[i].code);
    if (is_closed) fits = toks[i].code == ClosingOf(opening);
    brackets.Pass(i);
  }
  const TokenCode unclosed = is_closed ? tok::ENDMARKER : brackets.InnermostUpTo(place);
  if (unclosed != tok::ENDMARKER) return Said(": ", unclosed, " was never closed");
  if (kTextOfCode[error.needed].empty() || needed_follows) return plain;
  if (IsClosingBracket(error.needed) && !stands_at_closing) return plain;
  // A bracket that closes nothing: what is missing is its counterpart.
  if (!fits && !IsOpeningBracket(error.needed) && !IsClosingBracket(error.needed)) return plain;
  return Said(": expected ", error.needed, "");
}

}  // namespace quillet
