// The rarer ends of tokens: numbers of other bases, names beyond ASCII, and formatted strings whose
// fields are code of their own.
//
// A formatted string of 3.12 is a nesting of texts and fields. It is followed with a stack of its
// own: a frame is a string whose text or whose field the scan stands in. In text only quotes, braces
// and backslashes matter; in a field it steps over names, strings, comments and brackets. The trap
// is broken code, in which a quote within a field begins a string that never was meant: a field
// therefore ends the search where a line begins with a word that only begins statements, and the
// caller then takes the string as versions before 3.12 would.
#include "tokens/token_ends.h"

#include <algorithm>

#include "foundations/utf8.h"

namespace quillet {

const char* BasedNumberEnd(const char* at) {
  const char base = static_cast<char>(at[1] | 0x20);
  const auto is_digit = [base](char c) {
    switch (base) {
      case 'x':
        return IsAsciiDigit(c) || ((c | 0x20) >= 'a' && (c | 0x20) <= 'f');
      case 'o':
        return c >= '0' && c <= '7';
      case 'b':
        return c == '0' || c == '1';
      default:
        return false;
    }
  };
  const char* digits = at + 2;
  const char* next = digits;
  while (is_digit(next[*next == '_' ? 1 : 0])) next += *next == '_' ? 2 : 1;
  if (next == digits) return nullptr;
  return *next == 'l' || *next == 'L' ? next + 1 : next;
}

const char* UnicodeNameEnd(const char* at, const char* end, bool initial) {
  for (;;) {
    const DecodedChar decoded = DecodeUtf8(at, end);
    if (decoded.length == 0) return at;
    if ((CharClassOf(decoded.code_point) & (initial ? kCharIdStart : kCharIdContinue)) == 0) return at;
    initial = false;
    at = AsciiIdentifierEnd(at + decoded.length);
    if (static_cast<unsigned char>(*at) < 0x80) return at;
  }
}

const char* StrayEnd(const char* at, const char* end) {
  const DecodedChar decoded = DecodeUtf8(at, end);
  return at + (decoded.length == 0 ? 1 : decoded.length);
}

bool FindSingleStringEnd(const char* at, const char* end, const char*& stop) {
  const char quote = *at;
  stop = at + 1;
  for (;;) {
    stop = FindInSingleString(stop, end, quote);
    if (stop >= end || IsLineEnd(*stop)) return false;
    if (*stop == quote) {
      ++stop;
      return true;
    }
    ++stop;
    if (stop < end) stop = LineEndEnd(stop);
  }
}

namespace {

class FormattedStringScan {
 public:
  explicit FormattedStringScan(const char* end) : end_(end) {}

  const char* Run(const char* at, bool raw) {
    stop_ = at;
    at = Open(at, raw);
    while (at < end_) {
      if (frame_->in_text) {
        at = StepText(at);
        if (depth_ == 0) return at;
      } else {
        at = StepField(at);
      }
      if (!at) return nullptr;
      stop_ = std::max(stop_, at);
    }
    return nullptr;
  }

  const char* stop() const { return stop_; }

 private:
  // CPython follows 150 levels; a field in a format counts as one of them here, too.
  static constexpr int kMaxDepth = 150;

  struct Frame {
    char quote;
    bool triple;
    bool raw;
    bool in_text;       // or in the format of a field, otherwise in a field's code
    uint8_t formats;    // fields left open around the text: 1 in a format, 2 in a format's field's format
    uint32_t brackets;  // open in the field's code
  };

  // Enters the formatted string whose quotes stand at `at`.
  const char* Open(const char* at, bool raw) {
    if (depth_ == kMaxDepth) return nullptr;
    const bool triple = IsTripleQuote(at);
    frame_ = &frames_[depth_++];
    *frame_ = {*at, triple, raw, true, 0, 0};
    return at + (triple ? 3 : 1);
  }

  void Close() {
    --depth_;
    frame_ = depth_ > 0 ? &frames_[depth_ - 1] : nullptr;
  }

  const char* FindInText(const char* at) const {
    return frame_->quote == '"' ? FindAny<'"', '{', '}', '\\', '\n', '\r'>(at, end_)
                                : FindAny<'\'', '{', '}', '\\', '\n', '\r'>(at, end_);
  }

  const char* StepText(const char* at) {
    at = FindInText(at);
    stop_ = at;
    if (at >= end_) return nullptr;
    switch (*at) {
      case '\n':
      case '\r':
        return frame_->triple ? at + 1 : nullptr;
      case '\\':
        return StepEscape(at);
      case '{':
        // In a format a brace always opens a field; in text a double one stands for itself.
        if (at[1] == '{' && frame_->formats == 0) return at + 2;
        frame_->in_text = false;
        frame_->brackets = 0;
        return at + 1;
      case '}':
        if (frame_->formats > 0) --frame_->formats;
        return at + 1;
      default:
        if (frame_->triple && !IsTripleQuote(at)) return at + 1;
        if (frame_->formats > 0) return nullptr;
        at += frame_->triple ? 3 : 1;
        Close();
        return at;
    }
  }

  const char* StepEscape(const char* at) const {
    const char escaped = at[1];
    // A brace is not escaped by a backslash; the name of a character is no field.
    if (escaped == 'N' && at[2] == '{' && !frame_->raw) {
      const char* name_end = FindAny<'}', '"', '\'', '\n', '\r'>(at + 3, end_);
      return *name_end == '}' ? name_end + 1 : name_end;
    }
    if (escaped == '{' || escaped == '}') return at + 1;
    return at + 1 < end_ ? LineEndEnd(at + 1) : nullptr;
  }

  const char* StepField(const char* at) {
    const char c = *at;
    if (IsAsciiIdentifierByte(c)) return StepWord(at);
    switch (c) {
      case '"':
      case '\'':
        return StepPlainString(at);
      case '#':
        return FindAny<'\n', '\r'>(at, end_);
      case '\n':
      case '\r':
        return BeginsStatement(LineEndEnd(at)) ? nullptr : LineEndEnd(at);
      case '(':
      case '[':
      case '{':
        ++frame_->brackets;
        return at + 1;
      case ')':
      case ']':
        if (frame_->brackets > 0) --frame_->brackets;
        return at + 1;
      case '}':
        if (frame_->brackets > 0) {
          --frame_->brackets;
        } else {
          frame_->in_text = true;
        }
        return at + 1;
      case ':':
        if (frame_->brackets == 0) {
          if (frame_->formats == UINT8_MAX) return nullptr;
          ++frame_->formats;
          frame_->in_text = true;
        }
        return at + 1;
      default:
        return at + 1;
    }
  }

  // A name or number, or the prefix of a string with that string.
  const char* StepWord(const char* at) {
    const char* word_end = AsciiIdentifierEnd(at);
    if (!IsQuote(*word_end)) return word_end;
    const StringPrefix prefix = PrefixOf(at, static_cast<size_t>(word_end - at));
    if (prefix.valid && prefix.formatted) return Open(word_end, prefix.raw);
    return StepPlainString(word_end);
  }

  const char* StepPlainString(const char* at) {
    if (!IsTripleQuote(at)) return FindSingleStringEnd(at, end_, stop_) ? stop_ : nullptr;
    const char* string_end = TripleStringEnd(at, end_);
    if (!string_end) stop_ = end_;
    return string_end;
  }

  static bool BeginsStatement(const char* at) {
    uint32_t indent;
    return OnlyBeginsStatement(NameCodeAt(IndentEnd(at, indent)));
  }

  const char* end_;
  const char* stop_ = nullptr;  // bytes in front of it were looked at
  Frame* frame_ = nullptr;
  int depth_ = 0;
  Frame frames_[kMaxDepth];
};

}  // namespace

const char* NestedFormattedStringEnd(const char* at, const char* end, bool raw, const char*& stop) {
  FormattedStringScan scan(end);
  const char* string_end = scan.Run(at, raw);
  stop = scan.stop();
  return string_end;
}

}  // namespace quillet
