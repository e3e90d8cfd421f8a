// One table lookup a token; what is unusual is looked at in its place.
#include "analysis/closer_look.h"

#include <algorithm>
#include <cstring>

#include "lines/token_search.h"
#include "parser/string_escapes.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

bool HoldsDebugName(TokenSpan toks) {
  for (const Token& token : toks)
    if (token.code == tok::NAME && token.view() == "__debug__") return true;
  return false;
}

// `*args, name`, where a parameter or an argument may begin.
bool IsStarredWithNameBehind(TokenSpan toks, size_t star) {
  if (star == 0 || star + 3 >= toks.size()) return false;
  const TokenCode before = toks[star - 1].code;
  return (before == tok::LPAR || before == tok::COMMA || before == word::kLambda) &&
         toks[star + 2].code == tok::COMMA && toks[star + 3].code != tok::DOUBLESTAR;
}

bool IsDefinitionHead(const LogicalLine& line) {
  const size_t first = NextSignificant(line.toks, 0, line.toks.size());
  const size_t count = line.toks.size();
  if (first >= count) return false;
  if (line.toks[first].code == word::kDef) return true;
  const size_t next = NextSignificant(line.toks, first + 1, count);
  return line.toks[first].code == word::kAsync && next < count && line.toks[next].code == word::kDef;
}

bool IsUnusualNumber(const Token& number, const Token* next, bool underscores_are_known) {
  if (next != nullptr && next->text == number.end() && IsNameCode(next->code)) return true;
  if (number.length == 1) return false;
  const Text text = number.view();
  const char last = static_cast<char>(text.back() | 0x20);
  if (last == 'l') return true;
  if (text[0] == '0' && IsAsciiDigit(text[1])) return true;
  return !underscores_are_known && text.find('_') != Text::npos;
}

// A prefix that not all versions take, and bytes.
bool IsUnusualString(const Token& string, bool python3, bool formatted_are_known) {
  if (IsQuote(string.text[0])) return false;
  for (const char* at = string.text; !IsQuote(*at); ++at) {
    const char letter = static_cast<char>(*at | 0x20);
    if (letter == 'f' && !(python3 && formatted_are_known)) return true;
    if (python3 && (letter == 'b' || (letter == 'u' && !IsQuote(at[1])))) return true;
  }
  return false;
}

}  // namespace

CloserLook::CloserLook(Version version)
    : python3_(version.AtLeast(3, 0)), minor_(version.parts[1]), is_old_(python3_ && minor_ < 6) {
  for (const TokenCode code : {TokenCode{tok::COLONEQUAL}, TokenCode{word::kYield}, TokenCode{tok::NOTEQUAL},
                               TokenCode{tok::RARROW}, TokenCode{tok::NUMBER}})
    unusual_[code] = true;
  unusual_[tok::STRING] = true;
  unusual_[word::kAwait] = unusual_[word::kAsync] = unusual_[word::kNonlocal] = python3_;
  unusual_[word::kReturn] = true;
  unusual_[tok::SLASH] = python3_ && minor_ < 8;
  // The walk of the tables' trees sees all other targets.
  unusual_[tok::VBAREQUAL] = true;
  unusual_[tok::STAR] = unusual_[word::kNone] = !python3_;
  if (!python3_) unusual_[tok::NOTEQUAL] = false;
}

bool CloserLook::NeedsCompleteParser(const LogicalLine& line) const {
  if (line.kind == LineKind::kMatch || line.kind == LineKind::kCase || line.kind == LineKind::kTypeStatement)
    return true;
  const size_t count = line.toks.size();
  size_t i = NextSignificant(line.toks, 0, count);
  if (i >= count) return false;
  const auto next = [&] {
    return i = NextSignificant(line.toks, i + 1, count), i < count ? line.toks[i].code : tok::ENDMARKER;
  };
  TokenCode code = line.toks[i].code;
  if (code == word::kAsync) code = next();
  switch (code) {
    case word::kExcept:
      return next() == tok::STAR;
    case word::kWith:
      return next() == tok::LPAR;
    case word::kType:
      // The tables take the word off whatever name follows.
      return IsNameCode(next());
    case word::kDef:
    case word::kClass:
      next();
      if (!python3_ && i < count && line.toks[i].code == word::kNone) return true;
      return next() == tok::LSQB;
    default:
      return false;
  }
}

bool CloserLook::IsDoubtful(const LogicalLine& line, const LinePlace& place) const {
  if (is_old_ || (holds_debug_name_ && HoldsDebugName(line.toks))) return true;
  if (line.kind == LineKind::kFromImport) {
    TokenCode last = tok::ENDMARKER;
    for (const Token& token : line.toks) {
      if (token.code == tok::STAR && place.depth != 0) return true;
      if (!IsSkipCode(token.code)) last = token.code;
    }
    if (last == tok::COMMA) return true;
  }
  for (size_t i = 0; i < line.toks.size(); ++i) {
    const Token& token = line.toks[i];
    if (!unusual_[token.code]) [[likely]]
      continue;
    // Nearly all strings and many numbers.
    if (token.code == tok::STRING && IsQuote(*token.text) &&
        std::memchr(token.text, '\\', static_cast<size_t>(token.length)) == nullptr)
      continue;
    if (IsDoubtfulToken(line, i, place)) return true;
  }
  return false;
}

bool CloserLook::IsDoubtfulToken(const LogicalLine& line, size_t i, const LinePlace& place) const {
  const Token& token = line.toks[i];
  const Token* const next = i + 1 < line.toks.size() ? &line.toks[i + 1] : nullptr;
  switch (token.code) {
    case word::kYield:
    case word::kReturn:
      return !place.in_def || place.in_async_def;
    case word::kAwait:
      // A comprehension in another could not wait before 3.11.
      return !place.in_async_def || minor_ < 11;
    case word::kAsync:
      if (place.in_async_def) return minor_ < 11;
      return next != nullptr && (next->code == word::kFor || next->code == word::kWith);
    case word::kNonlocal:
      return place.depth == 0;
    case tok::NOTEQUAL:
      return *token.text == '<';
    case tok::RARROW:
      return *token.text != '-' || !IsDefinitionHead(line);
    case tok::NUMBER:
      return python3_ ? IsUnusualNumber(token, next, minor_ >= 6) : IsUnusualNumber(token, next, false);
    case tok::STRING:
      return IsUnusualString(token, python3_, minor_ >= 6) || !WrongEscape(token.view(), python3_).empty();
    case tok::STAR:
      return IsStarredWithNameBehind(line.toks, i);
    case word::kNone:
      return line.kind == LineKind::kImport || line.kind == LineKind::kFromImport || line.kind == LineKind::kExcept ||
             (i > 0 && line.toks[i - 1].code == tok::DOT);
    default:
      return true;
  }
}

}  // namespace quillet
