// The operator at a place in the source: its code and its length, longest match first.
//
// Operators of all versions are known at once ("<>", the backquote, ":=", "->"): no text that is
// valid in one version holds the operator of another by accident. Tables are made from
// token_ids.def: a code for each single byte, and for each byte that "=" follows.
#pragma once

#include <array>
#include <cstdint>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

namespace operators {

struct Tables {
  std::array<TokenCode, 128> single{};         // of one byte; ERRORTOKEN where it is none
  std::array<TokenCode, 128> with_equal{};     // of the byte and "="
  std::array<TokenCode, 128> doubled{};        // of the byte twice
  std::array<TokenCode, 128> doubled_equal{};  // of the byte twice and "="
};

constexpr void Enter(Tables& tables, TokenCode code, Text text) {
  const auto first = text.empty() ? 0 : static_cast<unsigned char>(text[0]);
  if (text.size() == 1) tables.single[first] = code;
  if (text.size() == 2 && text[1] == '=' && text[0] != '=') tables.with_equal[first] = code;
  if (text.size() == 2 && text[1] == text[0]) tables.doubled[first] = code;
  if (text.size() == 3 && text[1] == text[0] && text[2] == '=') tables.doubled_equal[first] = code;
}

constexpr Tables MakeTables() {
  Tables tables;
  tables.single.fill(tok::ERRORTOKEN);
  tables.with_equal.fill(tok::ERRORTOKEN);
  tables.doubled.fill(tok::ERRORTOKEN);
  tables.doubled_equal.fill(tok::ERRORTOKEN);
#define QUILLET_TOKEN(name, number, text) Enter(tables, number, text);
#include "tokens/token_ids.def"
  return tables;
}

inline constexpr Tables kTables = MakeTables();

}  // namespace operators

// "=" and the operators that assign with an operation. "->" shares its code with "@=" and passes.
inline constexpr bool IsAssignment(TokenCode code) {
  return code == tok::EQUAL || (code >= tok::PLUSEQUAL && code <= tok::DOUBLESTAREQUAL) ||
         code == tok::DOUBLESLASHEQUAL || code == tok::ATEQUAL;
}

struct Operator {
  TokenCode code;
  uint8_t length;
};

// The operator at `at`, an ASCII byte that two more readable bytes follow; ERRORTOKEN, length 1, for
// a byte that is none.
inline Operator OperatorAt(const char* at) {
  const auto first = static_cast<unsigned char>(at[0]);
  const operators::Tables& tables = operators::kTables;
  if (at[1] == at[0] && tables.doubled[first] != tok::ERRORTOKEN) {
    if (at[2] == '=' && tables.doubled_equal[first] != tok::ERRORTOKEN) return {tables.doubled_equal[first], 3};
    return {tables.doubled[first], 2};
  }
  if (at[1] == '=' && tables.with_equal[first] != tok::ERRORTOKEN) return {tables.with_equal[first], 2};
  if (at[1] == '>' && first == '-') return {tok::RARROW, 2};
  if (at[1] == '>' && first == '<') return {tok::NOTEQUAL, 2};
  if (at[1] == '.' && first == '.' && at[2] == '.') return {tok::ELLIPSIS, 3};
  return {tables.single[first], 1};
}

}  // namespace quillet
