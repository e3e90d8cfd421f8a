// A string literal on one line: the same value, spelt without control characters.
//
// Nearly every literal is copied as it stands. One with control characters is respelt byte by byte;
// what a backslash means in front of one differs between cooked and raw literals, so a raw literal
// that needs escapes is made a cooked one. The trap: a backslash in front of a control character
// stands for itself in a cooked literal and has to be doubled before the escape follows.
#include <algorithm>

#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

bool IsControl(char byte) { return static_cast<unsigned char>(byte) < 0x20 || byte == 0x7f; }
bool IsLineEnd(char byte) { return byte == '\n' || byte == '\r'; }
bool IsQuote(char byte) { return byte == '"' || byte == '\''; }

class Respeller {
 public:
  Respeller(Text literal, std::string& out) : at_(literal.data()), end_(at_ + literal.size()), out_(out) {}

  void Run() {
    Prefix();
    while (at_ < end_) {
      if (*at_ == '\\') {
        Backslash();
      } else if (IsControl(*at_)) {
        Control();
      } else {
        if (formatted_) TrackField();
        out_ += *at_++;
      }
    }
  }

 private:
  void Prefix() {
    for (; at_ < end_ && !IsQuote(*at_) && !IsControl(*at_) && *at_ != '\\'; ++at_) {
      const char letter = static_cast<char>(*at_ | 0x20);
      if (letter == 'r') {
        raw_ = true;
        continue;
      }
      if (letter == 'f' || letter == 't') formatted_ = true;
      if (letter == 'u') unicode_ = true;
      out_ += *at_;
    }
  }

  // Counts the braces that open and close fields; "{{" and "}}" in the text are no fields. Inside a
  // field the whole expression counts, nested displays and format specs with fields of their own.
  void TrackField() {
    if (*at_ == '{') {
      if (field_depth_ == 0 && Follows('{')) {
        out_ += *at_++;
      } else {
        ++field_depth_;
      }
    } else if (*at_ == '}' && field_depth_ > 0) {
      --field_depth_;
    }
  }

  bool Follows(char byte) const { return end_ - at_ >= 2 && at_[1] == byte; }

  void Backslash() {
    if (field_depth_ > 0) {
      out_ += *at_++;  // of a literal inside the field, or joining lines; see Control for those
      if (at_ < end_ && IsLineEnd(*at_)) out_.back() = ' ';
      return;
    }
    if (raw_) return RawBackslash();
    ++at_;
    if (at_ < end_ && IsLineEnd(*at_)) return SkipLineEnd();  // joins two lines and leaves nothing
    if (at_ < end_ && !IsControl(*at_)) {
      out_ += '\\';
      out_ += *at_++;
    } else {
      out_ += "\\\\";
    }
  }

  void RawBackslash() {
    const char* run_end = std::find_if(at_, end_, [](char byte) { return byte != '\\'; });
    const auto count = static_cast<size_t>(run_end - at_);
    const bool odd = count % 2 != 0;
    const char next = run_end < end_ ? *run_end : '\0';
    at_ = run_end;
    // ur"\u0041" of Python 2 decodes the escape although it is raw.
    const bool decodes = unicode_ && odd && (next == 'u' || next == 'U');
    out_.append(2 * count - (decodes ? 1 : 0), '\\');
    // A quote that a backslash keeps from ending the literal stays in its value.
    if (odd && IsQuote(next)) {
      out_ += '\\';
      out_ += *at_++;
    }
  }

  void SkipLineEnd() { at_ += *at_ == '\r' && Follows('\n') ? 2 : 1; }

  void Control() {
    if (field_depth_ > 0) {
      SkipLineEnd();
      out_ += ' ';
      return;
    }
    if (IsLineEnd(*at_)) {  // Whatever its form, the value holds "\n".
      SkipLineEnd();
      out_ += "\\n";
      return;
    }
    const char byte = *at_++;
    if (byte == '\t') {
      out_ += "\\t";
      return;
    }
    constexpr Text kDigits = "0123456789abcdef";
    out_ += "\\x";
    out_ += kDigits[static_cast<size_t>(byte >> 4)];
    out_ += kDigits[static_cast<size_t>(byte & 0xF)];
  }

  const char* at_;
  const char* const end_;
  std::string& out_;
  bool raw_ = false;
  bool formatted_ = false;
  bool unicode_ = false;
  int64_t field_depth_ = 0;
};

}  // namespace

void AppendEncodedStringLiteral(Text token_text, std::string& out) {
  if (std::none_of(token_text.begin(), token_text.end(), IsControl)) {
    out += token_text;
  } else {
    Respeller(token_text, out).Run();
  }
}

}  // namespace quillet
