// Which string literals of a statement are type hints.
#pragma once

#include <cstddef>
#include <vector>

#include "tokens/token.h"

namespace quillet {

class TypingNames;

// Appends the indices, in order, of the string tokens that stand for a type: in the annotations of
// parameters, returns and variables and in the first argument of `cast(...)` and `typing.cast(...)`,
// whole or inside subscripts. A literal is a hint only where it stands for a whole type of its own:
// no operand but of "|", no argument of a call, no value of `Literal[...]`, no metadata of
// `Annotated[...]`, not concatenated.
void FindStringHints(TokenSpan toks, std::vector<size_t>& hints);

// The same for a file whose imports are known: `cast`, `Literal` and `Annotated` are what it imports under any
// name. `may_be_text` tells for each hint whether it stands in a subscript of what no import shows to be of
// types: there a string that reads as no type is a string.
void FindStringHints(TokenSpan toks, const TypingNames& typing, std::vector<size_t>& hints,
                     std::vector<bool>& may_be_text);

// The same for the tokens of one type, such as those of a hint's own text.
void FindStringHintsOfType(TokenSpan toks, std::vector<size_t>& hints);

// The text between the quotes of a hint; none for a literal whose text is not what the program
// sees: bytes, a formatted string, or one with a backslash.
Text ContentsOfStringHint(const Token& string);

}  // namespace quillet
