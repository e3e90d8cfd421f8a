// A formatted string is text and fields in turn. The scan stands in text (doubled braces are literal)
// or in a format specification (they are not), and keeps but the number of specifications it stands
// in: a field in a specification ends in it, and its "}" leaves it.
//
// A field's code is scanned token by token, so that quotes, brackets and comments in it are those of
// the language. At depth 0 it ends at "}", ":" (also that of ":="), "!" that is no "!=", or a "="
// that only these follow. Formatted strings in a field are put on a list and looked into afterwards:
// there is no recursion, and the tokeniser bounds how deep they nest.
#include "lines/fstring_fields.h"

#include <algorithm>

#include "lines/expression_tokens.h"
#include "lines/token_search.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

size_t PrefixLength(Text string) {
  size_t length = 0;
  while (length < string.size() && !IsQuote(string[length])) ++length;
  return length;
}

class FieldScan {
 public:
  FieldScan(const Token& string, std::vector<Token>& tokens, std::vector<TokenRange>& fields,
            std::vector<Token>& nested, bool templates)
      : tokens_(tokens), fields_(fields), nested_(nested), templates_(templates) {
    const size_t prefix_length = PrefixLength(string.view());
    raw_ = PrefixOf(string.text, prefix_length).raw;
    at_ = string.text + prefix_length;
    const size_t quoted = string.length - prefix_length;
    const size_t quotes = quoted >= 6 && IsTripleQuote(at_) ? 3 : 1;
    end_ = string.end() - (quoted >= 2 ? quotes : 0);
    at_ = std::min(at_ + quotes, end_);
  }

  void Run() {
    while ((at_ = FindAny<'{', '}', '\\'>(at_, end_)) < end_) {
      switch (*at_) {
        case '{':
          if (formats_ == 0 && NextIs('{'))
            at_ += 2;
          else
            ScanField();
          break;
        case '}':
          EndOfFormat();
          break;
        default:
          ScanEscape();
          break;
      }
    }
    // The string ended within a field's format.
    if (formats_ > 0) Reject(end_);
  }

 private:
  bool NextIs(char c) const { return at_ + 1 < end_ && at_[1] == c; }

  void EndOfFormat() {
    if (formats_ > 0) {
      --formats_;
      ++at_;
    } else if (NextIs('}')) {
      at_ += 2;
    } else {
      Reject(at_++);
    }
  }

  // A brace is not escaped by a backslash; the name of a character is no field.
  void ScanEscape() {
    ++at_;
    if (raw_ || at_ >= end_ || *at_ == '{' || *at_ == '}') return;
    if (*at_++ != 'N' || at_ >= end_ || *at_ != '{') return;
    const char* name_end = FindAny<'}'>(at_, end_);
    at_ = std::min(name_end + 1, end_);
  }

  // From a field's "{" to behind its "}", or to behind the ":" of its format.
  void ScanField() {
    ++at_;
    field_begin_ = tokens_.size();
    ExpressionCheck check;
    bool is_over = false;
    while (!is_over) {
      at_ = SkipBlanksAndLineEnds(at_, end_);
      if (at_ >= end_) {
        AddError(end_);
        break;
      }
      if (check.depth() == 0 && IsEndOfExpression()) {
        if (!HasExpression()) AddError(at_);
        is_over = ScanFieldTail();
        continue;
      }
      Token token;
      at_ = ScanExpressionToken(at_, end_, token);
      check.Add(token);
      tokens_.push_back(token);
      if (token.code == tok::STRING && IsFormattedString(token)) nested_.push_back(token);
      if (templates_ && tokens_.size() - field_begin_ > 1 && IsTemplateString(tokens_[tokens_.size() - 2], token)) {
        const char* const begin = tokens_[tokens_.size() - 2].text;
        nested_.push_back({begin, static_cast<uint32_t>(token.end() - begin), tok::STRING});
      }
    }
    fields_.push_back({field_begin_, tokens_.size()});
  }

  bool IsEndOfExpression() const {
    switch (*at_) {
      case '}':
      case ':':
        return true;
      case '!':
        return !NextIs('=');
      case '=':
        return IsDebugSign();
      default:
        return false;
    }
  }

  // The "=" behind an expression whose text is shown, too.
  bool IsDebugSign() const {
    if (NextIs('=')) return false;
    const char* next = SkipToTail(at_ + 1);
    return next < end_ && (*next == '}' || *next == ':' || (*next == '!' && (next + 1 == end_ || next[1] != '=')));
  }

  // Over blanks, line ends and comments behind an expression; those that tell templates from names know of joined
  // lines.
  const char* SkipToTail(const char* at) const {
    for (;;) {
      at = SkipBlanksAndLineEnds(at, end_);
      if (at < end_ && *at == '#')
        at = FindAny<'\n', '\r'>(at, end_);
      else if (templates_ && IsJoin(at))
        ++at;
      else
        return at;
    }
  }

  bool IsJoin(const char* at) const { return at + 1 < end_ && *at == '\\' && IsLineEnd(at[1]); }

  bool HasExpression() const {
    return std::any_of(tokens_.begin() + static_cast<ptrdiff_t>(field_begin_), tokens_.end(),
                       [](const Token& token) { return !IsSkipCode(token.code); });
  }

  // "=", "!r" and the end of the field or ":"; false where something else follows, which then is
  // scanned behind an error token.
  bool ScanFieldTail() {
    if (*at_ == '=') {
      const char* const sign = at_;
      at_ = SkipToTail(at_ + 1);
      for (const char* at = sign; templates_ && at < at_; ++at)
        if (IsJoin(at)) tokens_.push_back({at, 1, tok::BACKSLASH});
    }
    if (*at_ == '!') {
      const char* sign = at_++;
      const char* name = at_;
      while (at_ < end_ && IsAsciiIdentifierByte(*at_)) ++at_;
      if (at_ - name != 1 || (*name != 'r' && *name != 's' && *name != 'a')) AddError(sign);
      at_ = SkipToTail(at_);
      if (at_ >= end_) {
        AddError(end_);
        return true;
      }
    }
    if (*at_ != '}' && *at_ != ':') {
      AddError(at_++);
      return false;
    }
    if (*at_ == ':') ++formats_;
    ++at_;
    return true;
  }

  // One error a place: what is at fault in two ways holds one token.
  void AddError(const char* at) {
    if (tokens_.size() == field_begin_ || tokens_.back().text < at) tokens_.push_back({at, 1, tok::ERRORTOKEN});
  }

  void Reject(const char* at) {
    tokens_.push_back({at, 1, tok::ERRORTOKEN});
    fields_.push_back({tokens_.size() - 1, tokens_.size()});
  }

  std::vector<Token>& tokens_;
  std::vector<TokenRange>& fields_;
  std::vector<Token>& nested_;
  const bool templates_;
  const char* at_;
  const char* end_;  // the closing quotes
  bool raw_;
  size_t field_begin_ = 0;  // where the tokens of the field begin
  size_t formats_ = 0;      // format specifications around the text
};

}  // namespace

bool IsFormattedString(const Token& string) {
  if (string.length == 0 || IsQuote(string.text[0])) return false;
  return PrefixOf(string.text, PrefixLength(string.view())).formatted;
}

bool IsTemplateString(const Token& name, const Token& string) {
  return name.end() == string.text && string.code == tok::STRING && IsQuote(*string.text) &&
         IsTemplatePrefix(name.view());
}

void AppendFieldTokens(const Token& string, std::vector<Token>& tokens, std::vector<TokenRange>& fields,
                       bool templates) {
  std::vector<Token> strings{string};
  for (size_t i = 0; i < strings.size(); ++i) {
    const Token next = strings[i];
    FieldScan(next, tokens, fields, strings, templates).Run();
  }
}

void AppendOwnFieldTokens(const Token& string, std::vector<Token>& tokens, std::vector<TokenRange>& fields) {
  std::vector<Token> nested;
  FieldScan(string, tokens, fields, nested, /*templates=*/false).Run();
}

}  // namespace quillet
