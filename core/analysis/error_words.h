// What a syntax error says beyond "invalid syntax": what is missing, concluded from where the parser stopped
// and from the tokens around that place.
//
// Said is only what holds however the statement was meant:
//   a bracket that is open where the parser stopped, and that nothing closes to the end of the statement:
//     invalid syntax: '(' was never closed
//   a token that could come there, without which what is open there cannot end (the colon of a head, the
//   "in" of a loop), and that does not follow, up to the end of the brackets around it:
//     invalid syntax: expected ':'
// A closing bracket is expected where another one stands, and a word or a colon not in front of a bracket
// that closes nothing. Anything else is "invalid syntax", and so is
// what holds a token that cannot be read, since the missing one may be hidden in that.
#pragma once

#include <string>

#include "foundations/errors.h"
#include "tokens/token.h"

namespace quillet {

// `toks` are those of the statement, which the error's index refers to.
std::string ExplainedSyntaxError(TokenSpan toks, const ParseError& error);

}  // namespace quillet
