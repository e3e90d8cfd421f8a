// The fields of a formatted string: the expressions in its braces, those in format specifications,
// and those of formatted strings inside of fields.
#pragma once

#include <cstdint>
#include <vector>

#include "tokens/token.h"

namespace quillet {

// A row of an embedded expression's tokens in a list of tokens.
struct TokenRange {
  size_t begin;
  size_t end;
};

// Whether a string token's prefix says that it is formatted.
bool IsFormattedString(const Token& string);

// Whether a name and the string behind it are a template string (3.14), whose fields are those of a formatted
// one: the tokeniser knows no such prefix.
bool IsTemplateString(const Token& name, const Token& string);

// Appends the tokens of each field of a formatted string, and the ranges of them, at least one token
// each. Where the language has no field (an empty one, one that is not closed, a lone closing brace),
// the range ends with or consists of an error token in the place that is at fault, which no grammar
// takes. The string's token is followed by 32 readable bytes at least. `templates`: fields of template strings within
// the fields as well.
void AppendFieldTokens(const Token& string, std::vector<Token>& tokens, std::vector<TokenRange>& fields,
                       bool templates = false);

// The same for the string's own fields alone, in the order of the source: of formatted strings inside of
// them there are the tokens.
void AppendOwnFieldTokens(const Token& string, std::vector<Token>& tokens, std::vector<TokenRange>& fields);

}  // namespace quillet
