// Where a SyntaxError points: from a token index, or a position, to line and offset from 1.
//
// The index of a token gives the token's start. An index behind the last token stands for what the
// parser added to close the statement, and points behind that token. The trap: a line that lost its
// tokens still gets an error, at its start, and its positions are not looked at.

#include "lines/syntax_error.h"

#include <utility>

namespace quillet {
namespace {

// Wide enough for sums of what a host may state.
struct WidePosition {
  int64_t line = 0;
  int64_t col = 0;
};

WidePosition PositionAt(const PositionView& positions, int64_t index) {
  const auto size = static_cast<int64_t>(positions.size());
  if (index < 0) index += size;
  if (index < 0 || index >= size) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  const Position position = positions[static_cast<size_t>(index)];
  return {position.line, position.col};
}

WidePosition BasePosition(const LogicalLine& logical, Context context) {
  if (context.IsPosition()) return {context.value, context.col};
  if (!context.IsIndex()) ThrowError(ErrorKind::kTypeError, "an error's context must be an int or a tuple");
  if (context.value < logical.token_count) return PositionAt(logical.positions(), context.value);

  WidePosition position = PositionAt(logical.positions(), -1);
  if (logical.toks.empty()) ThrowError(ErrorKind::kIndexError, "tuple index out of range");
  const Token& last = logical.toks.back();
  if (last.removed()) ThrowError(ErrorKind::kTypeError, "the last token of the line was removed");
  position.col += last.length;
  return position;
}

}  // namespace

SyntaxError CreateTextlessSyntaxError(std::string message, const LogicalLine& logical, Context context,
                                      const Position* in_token) {
  WidePosition position;
  if (logical.token_count != 0) {
    position = BasePosition(logical, context);
    if (in_token != nullptr) {
      // A place on the token's first line moves the column; one further down has its own.
      position.col = in_token->line == 0 ? position.col + in_token->col : in_token->col;
      position.line += in_token->line;
    }
  }
  return SyntaxError(std::move(message), "<string>", position.line + 1, position.col + 1, {});
}

SyntaxError CreateSyntaxError(std::string message, const LogicalLine& logical, Context context,
                              const Position* in_token) {
  SyntaxError error = CreateTextlessSyntaxError(std::move(message), logical, context, in_token);
  error.text = TextFromTokens(logical);
  return error;
}

}  // namespace quillet
