// One token at a time, by the scanner's own rules for the ends of names, numbers, strings and
// operators; what these rules take from behind the expression's end is cut off, and the code of the
// rest settled anew.
#include "lines/expression_tokens.h"

#include <algorithm>

#include "lines/token_search.h"
#include "tokens/operators.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

// Behind the string whose quotes stand at `quote`, or null.
const char* StringEnd(const char* quote, const char* end, StringPrefix prefix) {
  const char* string_end = nullptr;
  const bool may_be_triple = end - quote >= 6;
  if (prefix.formatted && (may_be_triple || !IsTripleQuote(quote))) {
    const char* stop;
    string_end = NestedFormattedStringEnd(quote, end, prefix.raw, stop);
  }
  if (string_end == nullptr) {
    string_end = may_be_triple && IsTripleQuote(quote) ? TripleStringEnd(quote, end) : SingleStringEnd(quote, end);
  }
  return string_end != nullptr && string_end <= end ? string_end : nullptr;
}

// Words that begin a statement and no expression.
bool BeginsNoExpression(TokenCode code) {
  return OnlyBeginsStatement(code) || code == word::kElse || code == word::kFor || code == word::kFrom ||
         code == word::kIf || code == word::kNonlocal || code == tok::AT;
}

}  // namespace

const char* ScanExpressionToken(const char* at, const char* end, Token& token) {
  const auto emit = [&](const char* token_end, TokenCode code) {
    token = {at, static_cast<uint32_t>(std::min(token_end, end) - at), code};
    if (token_end > end) token.code = CodeOfText(token.view());
    return token.end();
  };
  const auto emit_string = [&](const char* quote, StringPrefix prefix) {
    const char* string_end = StringEnd(quote, end, prefix);
    return string_end != nullptr ? emit(string_end, tok::STRING) : emit(end, tok::ERRORTOKEN);
  };

  const char c = *at;
  if (IsAsciiLetter(c) || c == '_') {
    const char* name_end = std::min(AsciiIdentifierEnd(at), end);
    if (name_end < end && IsQuote(*name_end)) {
      const StringPrefix prefix = PrefixOf(at, static_cast<size_t>(name_end - at));
      if (prefix.valid) return emit_string(name_end, prefix);
    }
    if (name_end < end && static_cast<unsigned char>(*name_end) >= 0x80) {
      const char* whole_end = std::min(UnicodeNameEnd(name_end, end, false), end);
      if (whole_end != name_end) return emit(whole_end, tok::NAME);
    }
    return emit(name_end, CodeOfName(at, static_cast<size_t>(name_end - at)));
  }
  if (IsAsciiDigit(c) || (c == '.' && at + 1 < end && IsAsciiDigit(at[1]))) return emit(NumberEnd(at), tok::NUMBER);
  if (IsQuote(c)) return emit_string(at, StringPrefix{true, false, false});
  if (c == '#') return emit(std::min(FindAny<'\n', '\r'>(at, end), end), tok::COMMENT);
  if (c == '\\') return emit(at + 1, tok::BACKSLASH);
  if (static_cast<unsigned char>(c) >= 0x80) {
    const char* name_end = std::min(UnicodeNameEnd(at, end, true), end);
    return name_end != at ? emit(name_end, tok::NAME) : emit(std::min(StrayEnd(at, end), end), tok::ERRORTOKEN);
  }
  const Operator op = OperatorAt(at);
  return emit(at + op.length, op.code);
}

const char* SkipBlanksAndLineEnds(const char* at, const char* end) {
  while (at < end && (*at == ' ' || *at == '\t' || *at == '\f' || IsLineEnd(*at))) ++at;
  return at;
}

void ExpressionCheck::Add(Token& token) {
  const TokenCode code = token.code;
  if (IsSkipCode(code)) return;
  bool is_good = !is_first_ || !BeginsNoExpression(code);
  is_first_ = false;
  if (IsOpeningBracket(code)) {
    ++depth_;
  } else if (IsClosingBracket(code)) {
    if (depth_ > 0) --depth_;
  } else if (depth_ == 0) {
    if (code == word::kLambda) {
      ++lambdas_;
    } else if (code == tok::COLON) {
      is_good = is_good && lambdas_ > 0;
      if (lambdas_ > 0) --lambdas_;
    } else if (IsAssignment(code) && *token.text != '-') {
      // A lambda's parameters may have defaults. ("->" shares the code of "@=", and no statement
      // that is an expression in front of it has it.)
      is_good = is_good && code == tok::EQUAL && lambdas_ > 0;
    } else if (code == tok::SEMI) {
      is_good = false;
    }
  }
  if (!is_good) token.code = tok::ERRORTOKEN;
}

void AppendExpressionTokens(const char* at, const char* end, std::vector<Token>& tokens) {
  ExpressionCheck check;
  while ((at = SkipBlanksAndLineEnds(at, end)) < end) {
    Token token;
    at = ScanExpressionToken(at, end, token);
    check.Add(token);
    tokens.push_back(token);
  }
}

}  // namespace quillet
