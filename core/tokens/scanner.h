// Bytes to tokens in one pass, with a client that hears where lines and statements may end.
//
// The loop dispatches on the class of the next byte: one table look-up and one switch a token. Long
// runs (names, strings, comments, indentation) are left sixteen bytes at a time. What is no token
// becomes an error token and the scan goes on, so it never fails: every byte lies in exactly one
// token or in a gap (blanks, line ends, a BOM, a separator the client drops).
//
// A string that is not closed is an error token to the end of its first line, and the next line is
// scanned as if nothing had been. That must not cost a search to the end of the source for every
// such string: facts of the form "no closing quote behind here" are kept, and nested formatted
// strings have a budget for searches that fail.
//
// The client is a template argument and its calls are inlined; `out` is what was found so far:
//   void BeginStatement(uint32_t indent, uint32_t bytes, const ScanOutput& out)   in front of a line's first token,
//   behind
//                                              so many bytes of indentation
//   void BlankLine(uint32_t indent, const ScanOutput& out)
//   void CommentLine(uint32_t indent, const ScanOutput& out)      behind the line's one token
//   bool Separator(const ScanOutput& out)      at a ";" outside brackets; true: it becomes no token
//   void KeptSeparator(const ScanOutput& out)  behind one that did
//   void EndStatement(const ScanOutput& out)   at a line end outside brackets, or at the end
//   bool ClosesBrackets(const char* line)      at a line begun within brackets; true: they end here
//   void Assign(uint32_t index), Colon(uint32_t index)            of a token outside brackets
//   void String(uint32_t index, bool formatted), Comment(Text comment)
//   void SeeName(TokenCode code), SeeUnderscore(const char* name), SeeOperator(char first, TokenCode code),
//   SeeWalrus(), SeeNumber(Text number)
//   SeeString(Text string, TokenCode before)   of a string with a prefix or an escape
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

#include "foundations/errors.h"
#include "foundations/stop.h"
#include "tokens/operators.h"
#include "tokens/token.h"
#include "tokens/token_ends.h"
#include "tokens/word_table.h"

namespace quillet {

namespace scanner {

enum ByteClass : uint8_t {
  kName,  // a letter
  kUnderscore,
  kBlank,   // blank, tab, form feed
  kSingle,  // an operator of its own: brackets, comma, "~", backquote
  kDot,
  kColon,
  kOperator,  // may be followed by more
  kDigit,
  kQuote,
  kLineEnd,
  kHash,
  kSemicolon,
  kBackslash,
  kHigh,  // 0x80 and above
  kNul,   // the end, or a NUL byte
  kStray,
};

struct ByteTables {
  std::array<ByteClass, 256> classes{};
  std::array<int8_t, 256> nesting{};  // what a byte of kSingle does to the depth
};

constexpr ByteTables MakeByteTables() {
  ByteTables tables;
  tables.classes.fill(kStray);
  const auto set = [&tables](Text bytes, ByteClass byte_class) {
    for (const char c : bytes) tables.classes[static_cast<unsigned char>(c)] = byte_class;
  };
  for (int c = 0x80; c < 0x100; ++c) tables.classes[c] = kHigh;
  for (int c = 'a'; c <= 'z'; ++c) tables.classes[c] = tables.classes[c - 'a' + 'A'] = kName;
  set("_", kUnderscore);
  set(" \t\f", kBlank);
  set("()[]{},~`", kSingle);
  set(".", kDot);
  set(":", kColon);
  set("+-*/%&|^=<>@!", kOperator);
  set("0123456789", kDigit);
  set("\"'", kQuote);
  set("\n\r", kLineEnd);
  set("#", kHash);
  set(";", kSemicolon);
  set("\\", kBackslash);
  tables.classes[0] = kNul;
  for (const char c : Text("([{")) tables.nesting[static_cast<unsigned char>(c)] = 1;
  for (const char c : Text(")]}")) tables.nesting[static_cast<unsigned char>(c)] = -1;
  return tables;
}

inline constexpr ByteTables kBytes = MakeByteTables();

// A vector that is written at its end without a look at its bookkeeping: it is kept longer than
// what it holds, and cut to size at the end.
template <class T>
class Appender {
 public:
  // More than `most` items are an OverflowError.
  Appender(std::vector<T>& items, size_t most) : items_(items), most_(most) {
    items_.resize(kChunk);
    Locate(0);
  }
  ~Appender() { items_.resize(count()); }
  Appender(const Appender&) = delete;
  Appender& operator=(const Appender&) = delete;

  // Filled in by the caller, and kept by Keep.
  T& next() { return *next_; }
  void Keep() {
    if (++next_ == limit_) [[unlikely]]
      Grow();
  }
  void Add(const T& item) {
    *next_ = item;
    Keep();
  }
  const T* base() const { return base_; }
  uint32_t count() const { return static_cast<uint32_t>(next_ - base_); }

 private:
  // Small, so that what resize() writes is still in the nearest cache when it is written again.
  static constexpr size_t kChunk = 512;

  void Grow() {
    CountSteps(kChunk);
    const size_t used = items_.size();
    if (used > most_) ThrowError(ErrorKind::kOverflowError, "the source holds too many tokens or lines");
    if (items_.capacity() < used + kChunk) items_.reserve(2 * used + kChunk);
    items_.resize(used + kChunk);
    Locate(used);
  }
  void Locate(size_t used) {
    base_ = items_.data();
    next_ = base_ + used;
    limit_ = base_ + items_.size();
  }

  std::vector<T>& items_;
  const size_t most_;
  T* base_;
  T* next_;
  T* limit_;
};

}  // namespace scanner

// What a scan has found so far. Token indices and lines count from 0.
class ScanOutput {
 public:
  ScanOutput(const char* begin, std::vector<Token>& tokens, std::vector<uint32_t>& line_starts, size_t most)
      : begin_(begin), tokens_(tokens, most), line_starts_(line_starts, most) {}

  const Token* tokens() const { return tokens_.base(); }
  uint32_t token_count() const { return tokens_.count(); }
  // Of the token that stands so many in front of the next one.
  TokenCode CodeBefore(uint32_t distance) const {
    return token_count() >= distance ? tokens()[token_count() - distance].code : TokenCode{tok::NEWLINE};
  }
  // The line under way.
  uint32_t line() const { return line_starts_.count() - 1; }
  const char* LineStart(uint32_t line) const { return begin_ + line_starts_.base()[line]; }

 protected:
  void AddLineStart(const char* at) { line_starts_.Add(static_cast<uint32_t>(at - begin_)); }

  const char* const begin_;
  scanner::Appender<Token> tokens_;

 private:
  scanner::Appender<uint32_t> line_starts_;
};

// What a client is that looks at no token.
struct SeesNoTokens {
  void SeeName(TokenCode, const ScanOutput&) {}
  void SeeUnderscore(const char*) {}
  void SeeOperator(char, TokenCode) {}
  void SeeWalrus() {}
  void SeeNumber(Text) {}
  void SeeEscape(const char*) {}
  bool saw_odd_escape() const { return false; }
  void SeeString(Text, TokenCode) {}
};

// The client that wants nothing but the tokens.
struct TokensOnly : SeesNoTokens {
  void BlankLine(uint32_t, const ScanOutput&) {}
  void CommentLine(uint32_t, const ScanOutput&) {}
  void BeginStatement(uint32_t, uint32_t, const ScanOutput&) {}
  bool Separator(const ScanOutput&) { return false; }
  void KeptSeparator(const ScanOutput&) {}
  void EndStatement(const ScanOutput&) {}
  bool ClosesBrackets(const char*) const { return false; }
  void Assign(uint32_t) {}
  void Colon(uint32_t) {}
  void String(uint32_t, bool) {}
  void Comment(Text) {}
};

template <class Client>
class Scanner : private ScanOutput {
 public:
  // The bytes are followed by padding of NUL bytes, 32 at least. `nested_fstrings`: as from 3.12 on.
  // `templates`: a string behind a name that is the prefix of a template string ends as a formatted one does.
  // Tokens and line starts are replaced; a line start follows each line end, so the last one is the
  // end of a source that ends with a line end. More than about `most` of either are an OverflowError.
  Scanner(Text bytes, bool nested_fstrings, std::vector<Token>& tokens, std::vector<uint32_t>& line_starts,
          Client& client, size_t most = SIZE_MAX, bool templates = false)
      : ScanOutput(bytes.data(), tokens, line_starts, most),
        end_(bytes.data() + bytes.size()),
        nested_fstrings_(nested_fstrings),
        templates_(templates),
        failed_search_budget_(8 * bytes.size() + 4096),
        client_(client) {}

  void Run() {
    const char* at = begin_;
    if (end_ - at >= 3 && Text(at, 3) == "\xEF\xBB\xBF") at += 3;
    AddLineStart(at);
    while (at) at = ScanLine(at);
  }

 private:
  using ByteClass = scanner::ByteClass;

  static ByteClass ClassOf(char c) { return scanner::kBytes.classes[static_cast<unsigned char>(c)]; }

  // Steps over the line end at `at`.
  const char* StepLineEnd(const char* at) {
    at = LineEndEnd(at);
    AddLineStart(at);
    return at;
  }

  // Line starts within a token that holds line ends.
  [[gnu::always_inline]] void AddLineStartsWithin(const char* at, const char* token_end) {
    while ((at = FindAny<'\n', '\r'>(at, token_end)) < token_end) at = StepLineEnd(at);
  }

  const char* Emit(const char* at, const char* token_end, TokenCode code) {
    Token& token = tokens_.next();
    token.text = at;
    token.length = static_cast<uint32_t>(token_end - at);
    token.code = code;
    tokens_.Keep();
    return token_end;
  }

  // Scans from the start of a line outside statements to the end of what begins there. Returns the
  // start of the next such line, null at the end of the source.
  const char* ScanLine(const char* at) {
    const char* const line = at;
    uint32_t indent;
    at = IndentEnd(at, indent);
    switch (ClassOf(*at)) {
      case ByteClass::kLineEnd:
        client_.BlankLine(indent, *this);
        return StepLineEnd(at);
      case ByteClass::kHash:
        at = EmitComment(at);
        client_.CommentLine(indent, *this);
        return at < end_ ? StepLineEnd(at) : nullptr;
      case ByteClass::kNul:
        if (at >= end_) {
          if (at > line) client_.BlankLine(indent, *this);
          return nullptr;
        }
        break;
      default:
        break;
    }
    client_.BeginStatement(indent, static_cast<uint32_t>(at - line), *this);
    return ScanStatements(at);
  }

  // Scans tokens up to the first line end that ends a statement, and over it.
  const char* ScanStatements(const char* at) {
    int32_t depth = 0;
    for (;;) {
      const char c = *at;
      switch (ClassOf(c)) {
        case ByteClass::kUnderscore:
          client_.SeeUnderscore(at);
          [[fallthrough]];
        case ByteClass::kName:
          at = ScanName(at);
          break;
        case ByteClass::kBlank:
          ++at;
          continue;
        case ByteClass::kSingle:
          depth = std::max(depth + scanner::kBytes.nesting[static_cast<unsigned char>(c)], 0);
          at = Emit(at, at + 1, operators::kTables.single[static_cast<unsigned char>(c)]);
          break;
        case ByteClass::kDot:
          if (IsAsciiDigit(at[1])) {
            at = EmitNumber(at);
          } else {
            const bool ellipsis = at[1] == '.' && at[2] == '.';
            at = Emit(at, at + (ellipsis ? 3 : 1), ellipsis ? tok::ELLIPSIS : tok::DOT);
          }
          break;
        case ByteClass::kColon:
          if (at[1] == '=') {
            client_.SeeWalrus();
            at = Emit(at, at + 2, tok::COLONEQUAL);
            break;
          }
          if (depth == 0) client_.Colon(tokens_.count());
          at = Emit(at, at + 1, tok::COLON);
          break;
        case ByteClass::kOperator: {
          const Operator op = OperatorAt(at);
          if (depth == 0 && IsAssignment(op.code) && (op.code != tok::ATEQUAL || c == '@')) {
            client_.Assign(token_count());
          }
          client_.SeeOperator(c, op.code);
          at = Emit(at, at + op.length, op.code);
          break;
        }
        case ByteClass::kDigit:
          at = EmitNumber(at);
          break;
        case ByteClass::kQuote:
          at = ScanString(at, at);
          break;
        case ByteClass::kLineEnd:
          if (depth == 0) {
            client_.EndStatement(*this);
            return StepLineEnd(at);
          }
          at = StepLineEnd(at);
          if (client_.ClosesBrackets(at)) {
            client_.EndStatement(*this);
            return at;
          }
          at = BlanksEnd(at);
          continue;
        case ByteClass::kHash:
          at = EmitComment(at);
          continue;
        case ByteClass::kSemicolon:
          if (depth > 0) {
            at = Emit(at, at + 1, tok::SEMI);
          } else if (client_.Separator(*this)) {
            ++at;
          } else {
            at = Emit(at, at + 1, tok::SEMI);
            client_.KeptSeparator(*this);
          }
          break;
        case ByteClass::kBackslash:
          at = Emit(at, at + 1, tok::BACKSLASH);
          if (!IsLineEnd(*at)) break;
          at = StepLineEnd(at);
          if (depth > 0 && client_.ClosesBrackets(at)) {
            client_.EndStatement(*this);
            return at;
          }
          at = BlanksEnd(at);
          continue;
        case ByteClass::kHigh:
          at = ScanHigh(at);
          break;
        case ByteClass::kNul:
          if (at >= end_) {
            client_.EndStatement(*this);
            return nullptr;
          }
          [[fallthrough]];
        case ByteClass::kStray:
          at = Emit(at, at + 1, tok::ERRORTOKEN);
          break;
      }
      // Most tokens are followed by one blank or by none.
      at += *at == ' ';
    }
  }

  const char* ScanName(const char* at) {
    const char* name_end = AsciiIdentifierEnd(at);
    const auto length = static_cast<size_t>(name_end - at);
    if (length <= 2 && IsQuote(*name_end) && PrefixOf(at, length).valid) return ScanString(at, name_end);
    if (static_cast<unsigned char>(*name_end) >= 0x80) [[unlikely]]
      return ScanUnicodeName(at, name_end);
    return EmitName(at, name_end);
  }

  // Apart, as nothing of a name is kept at hand over a call then.
  [[gnu::noinline]] const char* ScanUnicodeName(const char* at, const char* ascii_end) {
    const char* name_end = UnicodeNameEnd(ascii_end, end_, false);
    return name_end != ascii_end ? Emit(at, name_end, tok::NAME) : EmitName(at, ascii_end);
  }

  const char* EmitName(const char* at, const char* name_end) {
    const TokenCode code = CodeOfPaddedName(at, static_cast<size_t>(name_end - at));
    const char* const end = Emit(at, name_end, code);
    client_.SeeName(code, *this);
    return end;
  }

  const char* ScanHigh(const char* at) {
    const char* name_end = UnicodeNameEnd(at, end_, true);
    return name_end != at ? Emit(at, name_end, tok::NAME) : Emit(at, StrayEnd(at, end_), tok::ERRORTOKEN);
  }

  const char* EmitNumber(const char* at) {
    const char* number_end = NumberEnd(at);
    client_.SeeNumber(Text(at, static_cast<size_t>(number_end - at)));
    return Emit(at, number_end, tok::NUMBER);
  }

  const char* EmitComment(const char* at) {
    const char* comment_end = FindAny<'\n', '\r'>(at + 1, end_);
    client_.Comment(Text(at, static_cast<size_t>(comment_end - at)));
    return Emit(at, comment_end, tok::COMMENT);
  }

  void SeeString(const char* at, const char* string_end) {
    client_.SeeString(Text(at, static_cast<size_t>(string_end - at)), CodeBefore(1));
  }

  // The string whose prefix begins at `at` and whose quotes stand at `quote`.
  const char* ScanString(const char* at, const char* quote) {
    if (quote != at) {
      const StringPrefix prefix = PrefixOf(at, static_cast<size_t>(quote - at));
      if (prefix.formatted) return ScanFormattedString(at, quote, prefix.raw);
    } else if (templates_ && token_count() > 0) {
      const Token& name = tokens()[token_count() - 1];
      if (name.end() == at && IsTemplatePrefix(name.view())) return ScanFormattedString(at, quote, name.length == 2);
    }
    client_.String(tokens_.count(), false);
    return ScanPlainString(at, quote);
  }

  const char* ScanFormattedString(const char* at, const char* quote, bool raw) {
    client_.String(tokens_.count(), true);
    if (nested_fstrings_ && failed_search_budget_ > 0) {
      const char* stop;
      if (const char* string_end = NestedFormattedStringEnd(quote, end_, raw, stop)) {
        AddLineStartsWithin(quote, string_end);
        SeeString(at, string_end);
        return Emit(at, string_end, tok::STRING);
      }
      failed_search_budget_ -= std::min(failed_search_budget_, static_cast<size_t>(stop - quote));
    }
    return ScanPlainString(at, quote);
  }

  const char* ScanPlainString(const char* at, const char* quote) {
    if (IsTripleQuote(quote)) return ScanTripleString(at, quote);
    const char* stop = FindInSingleString(quote + 1, end_, *quote);
    if (*stop == *quote && stop < end_) {
      if (quote != at) [[unlikely]]
        SeeString(at, stop + 1);
      return Emit(at, stop + 1, tok::STRING);
    }
    return ScanEscapedString(at, quote, stop);
  }

  // A string with single quotes from its first backslash on, or to where it fails.
  const char* ScanEscapedString(const char* at, const char* quote, const char* stop) {
    Unclosed& unclosed = unclosed_single_[*quote == '"'];
    bool crosses_lines = false;
    while (stop < end_ && *stop == '\\') {
      client_.SeeEscape(stop);
      ++stop;
      if (stop < end_ && IsLineEnd(*stop)) {
        crosses_lines = true;
        stop = LineEndEnd(stop);
        // A search that passed this line start failed: so would this one.
        if (stop > unclosed.from && stop <= unclosed.to) return EmitUnclosed(at, quote);
      } else {
        stop = std::min(stop + 1, end_);
      }
      stop = FindInSingleString(stop, end_, *quote);
    }
    if (stop < end_ && *stop == *quote) {
      if (crosses_lines) AddLineStartsWithin(quote, stop);
      if (quote != at || client_.saw_odd_escape()) SeeString(at, stop + 1);
      return Emit(at, stop + 1, tok::STRING);
    }
    if (crosses_lines) unclosed = {quote, stop};
    return EmitUnclosed(at, quote);
  }

  const char* ScanTripleString(const char* at, const char* quote) {
    bool& unclosed = unclosed_triple_[*quote == '"'];
    if (!unclosed) {
      const char* string_end = TripleStringEnd(quote, end_, [this](const char* escape) { client_.SeeEscape(escape); });
      if (string_end != nullptr) {
        AddLineStartsWithin(quote, string_end);
        if (quote != at || client_.saw_odd_escape()) SeeString(at, string_end);
        return Emit(at, string_end, tok::STRING);
      }
      // Whatever closed a later string of this kind would have closed this one.
      unclosed = true;
    }
    return EmitUnclosed(at, quote);
  }

  const char* EmitUnclosed(const char* at, const char* quote) {
    return Emit(at, FindAny<'\n', '\r'>(quote, end_), tok::ERRORTOKEN);
  }

  // A search for a single quote that went over line ends from `from` to `to` in vain.
  struct Unclosed {
    const char* from;
    const char* to;
  };

  const char* const end_;
  const bool nested_fstrings_;
  const bool templates_;
  size_t failed_search_budget_;
  bool unclosed_triple_[2] = {};
  Unclosed unclosed_single_[2] = {{begin_, begin_}, {begin_, begin_}};
  Client& client_;
};

}  // namespace quillet
