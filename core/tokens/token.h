// A token: a view into the source and one byte that says what it is.
//
// The byte, the token's code, is its type id, except that a NAME which is one of the words of
// words.def has that word's code. Kind and keyword-ness are thus settled once, by the tokeniser,
// and no later stage compares text where a byte will do. Codes:
//   0..127    the type id (1 = NAME that is no listed word)
//   128..201  a listed word; its type id is NAME
//   202, 203  comment, backslash
//   255       a removed token: no text, kept so that indices stay valid
// Positions are not stored: they follow from where in its source a token's text stands.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "foundations/text.h"

namespace quillet {

using TokenCode = uint8_t;

namespace tok {
#define QUILLET_TOKEN(name, number, text) inline constexpr TokenCode name = number;
#include "tokens/token_ids.def"
inline constexpr TokenCode REMOVED = 255;
inline constexpr TokenCode FIRST_WORD = 128;
}  // namespace tok

namespace word {
enum Word : TokenCode {
  kBeforeFirst = tok::FIRST_WORD - 1,
#define QUILLET_WORD(identifier, text) k##identifier,
#include "tokens/words.def"
  kEnd,
};
}  // namespace word
static_assert(word::kEnd <= tok::COMMENT, "word codes and token ids must not meet");

inline constexpr bool IsWordCode(TokenCode code) { return code >= tok::FIRST_WORD && code < tok::COMMENT; }
inline constexpr bool IsNameCode(TokenCode code) { return code == tok::NAME || IsWordCode(code); }
inline constexpr int TypeOfCode(TokenCode code) { return IsWordCode(code) ? tok::NAME : code; }

// True for the keywords, of every version, that stand nowhere but at the front of a statement or of
// a clause. ("async" is not among them: a comprehension may hold it.)
inline constexpr bool OnlyBeginsStatement(TokenCode code) {
  switch (code) {
    case word::kAssert:
    case word::kBreak:
    case word::kClass:
    case word::kContinue:
    case word::kDef:
    case word::kDel:
    case word::kElif:
    case word::kExcept:
    case word::kFinally:
    case word::kGlobal:
    case word::kImport:
    case word::kPass:
    case word::kRaise:
    case word::kReturn:
    case word::kTry:
    case word::kWhile:
    case word::kWith:
      return true;
    default:
      return false;
  }
}

// A comment or a backslash: dropped in front of the parser.
inline constexpr bool IsSkipCode(TokenCode code) { return code == tok::COMMENT || code == tok::BACKSLASH; }

struct Token {
  const char* text = nullptr;
  uint32_t length = 0;
  TokenCode code = tok::REMOVED;

  Text view() const { return {text, length}; }
  bool removed() const { return text == nullptr; }
  const char* end() const { return text + length; }
};
static_assert(sizeof(Token) == 16, "a file's tokens are read three times; keep them in the cache");

using TokenSpan = std::span<const Token>;

// The code of a word, or tok::NAME for any other identifier.
TokenCode CodeOfName(const char* text, size_t length);

// The code that the tokeniser gives a token with this text. Total: a line end is tok::NEWLINE, what
// begins with "#" a comment and with "\\" a backslash, whatever follows; other text that is not
// exactly one token, the empty one included, is tok::ERRORTOKEN.
TokenCode CodeOfText(Text text);

// GetTokenType of the host: the type id of CodeOfText.
inline int GetTokenType(Text text) { return TypeOfCode(CodeOfText(text)); }

}  // namespace quillet
