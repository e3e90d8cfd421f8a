// Every syntax problem reaches a user as a SyntaxError that points at a place in its logical line.
//
// Positions are those of the line itself: relocating an error into an enclosing text is the
// caller's. The file is always "<string>", since only the caller knows it.
#pragma once

#include <string>

#include "foundations/errors.h"
#include "lines/logical_line.h"

namespace quillet {

// The error for a token index or a known position. An index at or past the token count lies behind
// the last token; a negative one counts from the end (IndexError before the start). `in_token`
// names a place inside the token, line and column from 0. TypeError for a context that is neither.
SyntaxError CreateSyntaxError(std::string message, const LogicalLine& logical, Context context,
                              const Position* in_token = nullptr);
// The same without the text of the line.
SyntaxError CreateTextlessSyntaxError(std::string message, const LogicalLine& logical, Context context,
                                      const Position* in_token = nullptr);

}  // namespace quillet
