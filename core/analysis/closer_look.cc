// What is unusual is looked at in its place.
#include "analysis/closer_look.h"

#include <algorithm>
#include <cstring>

#include "lines/token_search.h"
#include "parser/string_escapes.h"
#include "tokens/byte_scan.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

constexpr Text kDebugName = "__debug__";

// `*args, name`, where a parameter or an argument may begin.
bool IsStarredWithNameBehind(TokenSpan toks, size_t star) {
  if (star == 0 || star + 3 >= toks.size()) return false;
  const TokenCode before = toks[star - 1].code;
  return (before == tok::LPAR || before == tok::COMMA || before == word::kLambda) &&
         toks[star + 2].code == tok::COMMA && toks[star + 3].code != tok::DOUBLESTAR;
}

bool IsDottedName(TokenSpan toks) {
  for (size_t i = 0; i < toks.size(); ++i)
    if (toks[i].code != (i % 2 == 0 ? tok::NAME : tok::DOT)) return false;
  return toks.size() % 2 == 1;
}

bool IsDefinitionHead(const LogicalLine& line) {
  const size_t first = NextSignificant(line.toks, 0, line.toks.size());
  const size_t count = line.toks.size();
  if (first >= count) return false;
  if (line.toks[first].code == word::kDef) return true;
  const size_t next = NextSignificant(line.toks, first + 1, count);
  return line.toks[first].code == word::kAsync && next < count && line.toks[next].code == word::kDef;
}

// Nearly all of what is looked at.
bool IsUsual(const Token& token) {
  switch (token.code) {
    case tok::NAME:
      return token.length != kDebugName.size();
    case tok::STRING:
      return IsQuote(*token.text) && UnusualTokens::IsPlainString(token.view());
    default:
      return false;
  }
}

bool IsUnusualNumber(const Token& number, const Token* next, bool underscores_are_known) {
  if (next != nullptr && next->text == number.end() && IsNameCode(next->code)) return true;
  if (number.length == 1) return false;
  const Text text = number.view();
  const char last = static_cast<char>(text.back() | 0x20);
  if (last == 'l') return true;
  if (text[0] == '0' && (IsAsciiDigit(text[1]) || text[1] == '_')) return true;
  return !underscores_are_known && text.find('_') != Text::npos;
}

// Of a token beside bytes: whether it may be text, or stand in front of some.
bool MayBeText(const Token& token, bool is_last) {
  if (token.code != tok::STRING) return !is_last && (token.removed() || IsSkipCode(token.code));
  return (token.text[0] | 0x20) != 'b' && (IsQuote(token.text[0]) || (token.text[1] | 0x20) != 'b');
}

// Eight bytes at a time: such literals are long.
bool IsAsciiText(Text text) {
  const char* at = text.data();
  const char* const end = at + text.size();
  uint64_t bytes = 0;
  for (; end - at >= 8; at += 8) {
    uint64_t eight;
    std::memcpy(&eight, at, sizeof eight);
    bytes |= eight;
  }
  for (; at < end; ++at) bytes |= static_cast<unsigned char>(*at);
  return (bytes & 0x8080808080808080u) == 0;
}

// Bytes are ASCII, and no text stands beside them.
bool AreUnusualBytes(TokenSpan toks, size_t i) {
  const Text text = toks[i].view();
  if (!IsAsciiText(text)) return true;
  return (i > 0 && MayBeText(toks[i - 1], false)) ||
         (i + 1 < toks.size() && MayBeText(toks[i + 1], i + 2 == toks.size()));
}

// A prefix that not all versions take, and bytes.
bool IsUnusualString(TokenSpan toks, size_t i, bool python3, bool formatted_are_known) {
  const Token& string = toks[i];
  if (IsQuote(string.text[0])) return false;
  for (const char* at = string.text; !IsQuote(*at); ++at) {
    const char letter = static_cast<char>(*at | 0x20);
    if (letter == 'f' && !(python3 && formatted_are_known)) return true;
    if (python3 && letter == 'b' && AreUnusualBytes(toks, i)) return true;
    if (python3 && letter == 'u' && !IsQuote(at[1])) return true;
    if (!python3 && letter == 'r' && !IsQuote(at[1])) return true;
  }
  return false;
}

}  // namespace

CloserLook::CloserLook(Version version)
    : python3_(version.AtLeast(3, 0)), minor_(version.parts[1]), is_old_(python3_ && minor_ < 6) {
  const auto set = [this](TokenCode code, bool is_unusual) { is_unusual_[code] = is_unusual; };
  for (const TokenCode code :
       {TokenCode{tok::COLONEQUAL}, TokenCode{word::kYield}, TokenCode{tok::NOTEQUAL}, TokenCode{tok::RARROW},
        TokenCode{tok::NAME}, TokenCode{tok::NUMBER}, TokenCode{tok::STRING}, TokenCode{word::kReturn}})
    set(code, true);
  for (const TokenCode code : {word::kAwait, word::kAsync, word::kNonlocal}) set(code, python3_);
  set(tok::SLASH, python3_ && minor_ < 8);
  // The walk of the tables' trees sees all other targets.
  set(tok::VBAREQUAL, true);
  set(tok::STAR, !python3_);
  set(word::kNone, !python3_);
  if (!python3_) set(tok::NOTEQUAL, false);
}

bool CloserLook::NeedsCompleteParserBehind(const LogicalLine& line) const {
  switch (line.kind) {
    case LineKind::kMatch:
    case LineKind::kCase:
    case LineKind::kTypeStatement:
      return true;
    // Of these, and of what no kind is said of, it is their first tokens that tell.
    case LineKind::kExcept:
    case LineKind::kWith:
    case LineKind::kFunctionDef:
    case LineKind::kClassDef:
    case LineKind::kUnknown:
    case LineKind::kAssignment:
      break;
    default:
      return false;
  }
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

uint8_t CloserLook::DoubtOf(const LogicalLine& line) const {
  if (is_old_) return kEverywhere;
  uint8_t doubt = kNowhere;
  if (line.kind == LineKind::kFromImport) {
    TokenCode last = tok::ENDMARKER;
    for (const Token& token : line.toks) {
      if (!IsSkipCode(token.code)) last = token.code;
    }
    if (last == tok::COMMA) return kEverywhere;
    if (last == tok::STAR) doubt |= kInDefinition;
  }
  for (size_t i = 0; i < line.toks.size(); ++i)
    if (is_unusual_[line.toks[i].code] && !IsUsual(line.toks[i])) doubt |= DoubtOfToken(line, i);
  return doubt;
}

bool CloserLook::MayBeInScope(TokenSpan toks, size_t i) const {
  return std::ranges::any_of(toks.first(i), [this](const Token& token) {
    return token.code == word::kLambda || (minor_ >= 14 && (token.code == tok::COLON || token.code == tok::RARROW));
  });
}

uint8_t CloserLook::DoubtOfToken(const LogicalLine& line, size_t i) const {
  const Token& token = line.toks[i];
  const Token* const next = i + 1 < line.toks.size() ? &line.toks[i + 1] : nullptr;
  const auto if_so = [](bool is_doubtful) { return static_cast<uint8_t>(is_doubtful ? kEverywhere : kNowhere); };
  switch (token.code) {
    case tok::NAME:
      return if_so(token.view() == kDebugName);
    case word::kReturn:
      return kOutsideOfFunction;
    case word::kYield:
      // In brackets it may be in a comprehension.
      if (python3_ && i > 0 && line.toks[i - 1].code == tok::LPAR) return kEverywhere;
      return next != nullptr && next->code == word::kFrom ? kOutsideOfFunction | kInAsync : kOutsideOfFunction;
    case word::kAwait:
      // A comprehension in another could not wait before 3.11, and nor can a lambda, or an annotation from 3.14 on.
      return minor_ < 11 || MayBeInScope(line.toks, i) ? kEverywhere : kOutsideOfAsync;
    case word::kAsync: {
      const bool is_waiting = next != nullptr && (next->code == word::kFor || next->code == word::kWith);
      const bool is_odd = minor_ < 11 || MayBeInScope(line.toks, i);
      return static_cast<uint8_t>((is_odd ? kInAsync : kNowhere) | (is_waiting ? kOutsideOfAsync : kNowhere));
    }
    case word::kNonlocal:
      return kInModule;
    case tok::NOTEQUAL:
      return if_so(*token.text == '<');
    case tok::RARROW:
      return if_so(*token.text != '-' || !IsDefinitionHead(line));
    case tok::NUMBER:
      return if_so(IsUnusualNumber(token, next, python3_ && minor_ >= 6));
    case tok::STRING:
      return if_so(IsUnusualString(line.toks, i, python3_, minor_ >= 6) ||
                   (!UnusualTokens::HasPlainEscapes(token.view()) && !WrongEscape(token.view(), python3_).empty()));
    case tok::STAR:
      return if_so(IsStarredWithNameBehind(line.toks, i));
    case tok::VBAREQUAL:
      return if_so(!IsDottedName(line.toks.first(i)));
    case word::kNone:
      return if_so(line.kind == LineKind::kImport || line.kind == LineKind::kFromImport ||
                   line.kind == LineKind::kExcept || (i > 0 && line.toks[i - 1].code == tok::DOT));
    default:
      return kEverywhere;
  }
}

}  // namespace quillet
