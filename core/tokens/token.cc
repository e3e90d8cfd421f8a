// The code of a text by itself, as the tokeniser would settle it in a source.
//
// Names and operators are looked up where they stand. Numbers and strings end by the tokeniser's own
// rules, which load bytes behind the text, so these are looked at in a padded copy.
#include "tokens/token.h"

#include <cstring>
#include <memory>

#include "tokens/operators.h"
#include "tokens/token_ends.h"
#include "tokens/word_table.h"

namespace quillet {

TokenCode CodeOfName(const char* text, size_t length) {
  if (length == 0 || length > word_table::kMaxLength) return tok::NAME;
  return word_table::CodeOfNumber(word_table::NumberOf({text, length}), length);
}

namespace {

// A copy of a text that NUL bytes follow.
class PaddedCopy {
 public:
  explicit PaddedCopy(Text text) {
    char* bytes = small_;
    if (text.size() + kPadding > sizeof small_) {
      large_.reset(new char[text.size() + kPadding]);
      bytes = large_.get();
    }
    std::memcpy(bytes, text.data(), text.size());
    std::memset(bytes + text.size(), 0, kPadding);
    begin_ = bytes;
    end_ = bytes + text.size();
  }

  const char* begin() const { return begin_; }
  const char* end() const { return end_; }

 private:
  static constexpr size_t kPadding = 32;

  char small_[256];
  std::unique_ptr<char[]> large_;
  const char* begin_;
  const char* end_;
};

bool IsWholeString(Text text, size_t prefix_length) {
  const StringPrefix prefix = PrefixOf(text.data(), prefix_length);
  if (!prefix.valid) return false;
  const PaddedCopy copy(text);
  const char* quote = copy.begin() + prefix_length;
  const char* end = IsTripleQuote(quote) ? TripleStringEnd(quote, copy.end()) : SingleStringEnd(quote, copy.end());
  if (end == copy.end()) return true;
  const char* stop;
  return prefix.formatted && NestedFormattedStringEnd(quote, copy.end(), prefix.raw, stop) == copy.end();
}

// Text that begins with a letter, "_" or a byte beyond ASCII.
TokenCode CodeOfNameOrString(Text text) {
  const char* const end = text.data() + text.size();
  const char* at = text.data();
  while (at < end && IsAsciiIdentifierByte(*at)) ++at;
  if (at == end) return CodeOfName(text.data(), text.size());
  if (IsQuote(*at)) return IsWholeString(text, static_cast<size_t>(at - text.data())) ? tok::STRING : tok::ERRORTOKEN;
  if (static_cast<unsigned char>(*at) < 0x80) return tok::ERRORTOKEN;
  const PaddedCopy copy(text);
  const auto ascii_length = at - text.data();
  const char* name_end = UnicodeNameEnd(copy.begin() + ascii_length, copy.end(), ascii_length == 0);
  return name_end == copy.end() ? tok::NAME : tok::ERRORTOKEN;
}

TokenCode CodeOfOperator(Text text) {
  char padded[4] = {};
  if (text.size() >= sizeof padded) return tok::ERRORTOKEN;
  std::memcpy(padded, text.data(), text.size());
  const Operator op = OperatorAt(padded);
  return op.length == text.size() ? op.code : tok::ERRORTOKEN;
}

}  // namespace

TokenCode CodeOfText(Text text) {
  if (text.empty()) return tok::ERRORTOKEN;
  const char first = text[0];
  if (IsAsciiLetter(first) || first == '_' || static_cast<unsigned char>(first) >= 0x80) {
    return CodeOfNameOrString(text);
  }
  if (IsAsciiDigit(first) || (first == '.' && text.size() > 1 && IsAsciiDigit(text[1]))) {
    const PaddedCopy copy(text);
    return NumberEnd(copy.begin()) == copy.end() ? tok::NUMBER : tok::ERRORTOKEN;
  }
  switch (first) {
    case '"':
    case '\'':
      return IsWholeString(text, 0) ? tok::STRING : tok::ERRORTOKEN;
    case '#':
      return tok::COMMENT;
    case '\\':
      return tok::BACKSLASH;
    case '\n':
    case '\r':
      return text.size() == 1 || text == "\r\n" ? tok::NEWLINE : tok::ERRORTOKEN;
    default:
      return CodeOfOperator(text);
  }
}

}  // namespace quillet
