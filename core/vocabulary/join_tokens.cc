// Tokens joined to text: blanks where a person would write them, and wherever the text would read
// differently without.
//
// Each item is looked at only at its edges: what its first and its last token are decides, with the
// bracket the item stands in, whether a blank goes between two items. So joining is linear, and an
// item that was joined before is copied as it stands. Two questions are asked of a pair: does style
// want a blank, and if not, would the edges grow together (`<` `=`, `1` `.`, `r` `"x"`)? Style may be
// wrong about an odd sequence of tokens; the second answer may not.
//
// The trap is ":": alone, a slice and a pair of a dict look the same, and a pair that was joined
// without its braces was joined as a slice. Where an item stands in braces its colons are given their
// blanks belatedly.
#include <array>

#include "foundations/utf8.h"
#include "tokens/nonnested.h"
#include "tokens/token.h"
#include "vocabulary/symbolinfo.h"

namespace quillet {

namespace {

enum class Edge : uint8_t {
  kNone,   // in front of the first item
  kBlank,  // the item itself ends or begins with white space
  kWord,   // a keyword that is no value
  kValue,  // a name, number, string or "..."
  kOpen,   // an opening bracket
  kClose,  // a closing bracket
  kComma,  // "," or ";"
  kColon,
  kDot,
  kEqual,
  kOperator,
  kBackquote,  // opens or closes, by where it stands
  kOther,      // what is no token
};

constexpr TokenCode kNoSingleToken = tok::ERRORTOKEN;

// How a token of each code behaves beside others.
constexpr std::array<Edge, 256> kEdgeOfCode = [] {
  std::array<Edge, 256> table{};
  table.fill(Edge::kOther);
  for (int code = tok::PLUS; code <= tok::COLONEQUAL; ++code) table[code] = Edge::kOperator;
  for (int code = tok::FIRST_WORD; code < word::kEnd; ++code) table[code] = Edge::kWord;
  for (const TokenCode code : {tok::NAME, tok::NUMBER, tok::STRING, tok::ELLIPSIS}) table[code] = Edge::kValue;
  // Constants, and words that are names wherever an expression has them.
  for (const TokenCode code : {+word::kNone, +word::kTrue, +word::kFalse, +word::kMatch, +word::kCase, +word::kType,
                               +word::kUnderscore, +word::kPrint, +word::kExec}) {
    table[code] = Edge::kValue;
  }
  for (const TokenCode code : {tok::LPAR, tok::LSQB, tok::LBRACE}) table[code] = Edge::kOpen;
  for (const TokenCode code : {tok::RPAR, tok::RSQB, tok::RBRACE}) table[code] = Edge::kClose;
  for (const TokenCode code : {tok::COMMA, tok::SEMI}) table[code] = Edge::kComma;
  table[tok::COLON] = Edge::kColon;
  table[tok::DOT] = Edge::kDot;
  table[tok::EQUAL] = Edge::kEqual;
  table[tok::BACKQUOTE] = Edge::kBackquote;
  return table;
}();

bool IsIdentifierByte(char byte) {
  return (AsciiClassOf(byte) & (kAsciiAlpha | kAsciiDigit | kAsciiUnderscore)) != 0 ||
         static_cast<unsigned char>(byte) >= 0x80;
}
bool IsDigitByte(char byte) { return (AsciiClassOf(byte) & kAsciiDigit) != 0; }
bool IsSpaceByte(char byte) { return (AsciiClassOf(byte) & kAsciiSpace) != 0; }
bool IsQuoteByte(char byte) { return byte == '"' || byte == '\''; }
bool IsOperatorByte(char byte) { return Text("+-*/%@&|^~<>=!:.").find(byte) != Text::npos; }

// Operators that can stand in front of their only operand.
bool CanBeUnary(TokenCode code) {
  return code == tok::PLUS || code == tok::MINUS || code == tok::TILDE || code == tok::STAR ||
         code == tok::DOUBLESTAR || code == tok::AT;
}

// One end of an item.
struct Side {
  Edge edge = Edge::kNone;
  TokenCode code = kNoSingleToken;  // where the token at this end is known
};

// What a byte at the end of an item says of the token there.
Side SideOfByte(char byte) {
  if (IsIdentifierByte(byte) || IsQuoteByte(byte)) return {Edge::kValue};
  if (IsSpaceByte(byte)) return {Edge::kBlank};
  const TokenCode code = CodeOfText({&byte, 1});
  return {kEdgeOfCode[code], code};
}

Side FirstSide(Text item) {
  if (item[0] == '.' && item.size() > 1 && IsDigitByte(item[1])) return {Edge::kValue};
  if (item.starts_with("...")) return {Edge::kValue};
  return SideOfByte(item[0]);
}

// Where the identifier bytes at the end begin.
size_t StartOfLastRun(Text item) {
  size_t start = item.size();
  while (start > 0 && IsIdentifierByte(item[start - 1])) --start;
  return start;
}

Side LastSide(Text item) {
  const char last = item.back();
  if (last == '.') {
    const bool number = item.size() > 1 && IsDigitByte(item[item.size() - 2]);
    return {number || item.ends_with("...") ? Edge::kValue : Edge::kDot};
  }
  if (!IsIdentifierByte(last)) return SideOfByte(last);
  const size_t start = StartOfLastRun(item);
  const TokenCode code = CodeOfName(item.data() + start, item.size() - start);
  return {kEdgeOfCode[code], code};
}

// Whether the bytes read as one operator.
bool IsOperatorText(const char* bytes, size_t size) {
  const TokenCode code = CodeOfText({bytes, size});
  return code >= tok::LPAR && code <= tok::COLONEQUAL;
}

// Whether a "." may go on with what stands at the end: the last run of identifier bytes begins with
// a digit, and is not itself a fraction.
bool EndsLikeInteger(Text item) {
  const size_t start = StartOfLastRun(item);
  return start < item.size() && IsDigitByte(item[start]) && (start == 0 || item[start - 1] != '.');
}

// Whether the edges of two items read differently when they touch.
bool GrowTogether(Text before, Text after) {
  const char last = before.back();
  const char first = after[0];
  const auto ends_in_token = [](char byte) { return IsIdentifierByte(byte) || IsQuoteByte(byte); };
  if (ends_in_token(last) && ends_in_token(first)) return true;
  if (first == '.') return last == '.' || EndsLikeInteger(before);
  if (last == '.') {
    // A dot begins a number, or is the end of one that letters would go on.
    return IsDigitByte(first) || (before.size() > 1 && IsDigitByte(before[before.size() - 2]));
  }
  if (!IsOperatorByte(last) || !IsOperatorByte(first)) return false;
  // The last operator of `before` may be up to three bytes long; which of them it is, is not known.
  char joined[4];
  for (size_t size = 1; size <= 2 && size <= before.size(); ++size) {
    const Text tail = before.substr(before.size() - size);
    tail.copy(joined, size);
    joined[size] = first;
    if (IsOperatorText(joined, size + 1)) return true;
  }
  return false;
}

class Joiner {
 public:
  explicit Joiner(std::string& out) : out_(out) {}

  void Add(Text item) { Add(item, item.empty() || IsQuoteByte(item[0]) ? kNoSingleToken : CodeOfText(item)); }

  void Add(Text item, TokenCode code) {
    if (item.empty()) return;
    const bool single = code != kNoSingleToken;
    Side first = single ? Side{kEdgeOfCode[code], code} : FirstSide(item);
    const bool unary = first.edge == Edge::kOperator && IsUnaryPlace() && (!single || CanBeUnary(code));
    if (first.edge == Edge::kBackquote) first.edge = single && InBackquotes() ? Edge::kClose : Edge::kOpen;

    if (!previous_.empty() && (StyleWantsBlank(first) || GrowTogether(previous_, item))) out_ += ' ';
    if (!single && InBraces()) {
      AppendWithSpacedColons(item);
    } else {
      out_ += item;
    }

    if (single) {
      last_ = first;
      last_is_unary_ = unary;
      UpdateContext(code);
    } else {
      last_ = LastSide(item);
      if (last_.edge == Edge::kBackquote) last_.edge = Edge::kClose;
      last_is_unary_ = last_.edge == Edge::kOperator;
      colon_wants_blank_ = false;
    }
    previous_ = item;
  }

 private:
  // An operator here has no operand in front of it.
  bool IsUnaryPlace() const {
    switch (last_.edge) {
      case Edge::kNone:
      case Edge::kWord:
      case Edge::kOpen:
      case Edge::kComma:
      case Edge::kColon:
      case Edge::kEqual:
      case Edge::kOperator:
        return true;
      case Edge::kBlank:
      case Edge::kValue:
      case Edge::kClose:
      case Edge::kDot:
      case Edge::kBackquote:
      case Edge::kOther:
        return false;
    }
    return false;
  }

  bool StyleWantsBlank(const Side& next) const {
    if (last_.edge == Edge::kBlank || next.edge == Edge::kBlank) return false;
    if (last_.edge == Edge::kOther || next.edge == Edge::kOther) return true;
    if (next.edge == Edge::kClose || next.edge == Edge::kComma || next.edge == Edge::kColon) return false;
    if (last_.edge == Edge::kOpen) return false;
    if (last_.edge == Edge::kComma) return true;
    if (last_.edge == Edge::kColon) return colon_wants_blank_;
    if (last_.edge == Edge::kDot) return next.code == word::kImport;
    // A default is set off only where the parameter is annotated.
    if (next.edge == Edge::kEqual || last_.edge == Edge::kEqual) return InAnnotated();
    if (last_.edge == Edge::kOperator) return !last_is_unary_;
    if (last_.edge == Edge::kWord) return true;
    // Behind a value or a closing bracket.
    if (next.edge == Edge::kDot) return false;
    if (next.edge == Edge::kOpen) return next.code != tok::LPAR && next.code != tok::LSQB;
    return true;
  }

  bool InBraces() const { return !open_.empty() && open_.back() == '{'; }
  bool InAnnotated() const { return !open_.empty() && open_.back() == 'a'; }
  bool InBackquotes() const { return !open_.empty() && open_.back() == '`'; }

  // What single tokens open, and what a colon or an "=" therefore means. A lambda counts as a bracket
  // that its colon closes.
  void UpdateContext(TokenCode code) {
    switch (code) {
      case tok::LPAR:
        return Open('(');
      case tok::LSQB:
        return Open('[');
      case tok::LBRACE:
        return Open('{');
      case tok::BACKQUOTE:
        return InBackquotes() ? Close() : Open('`');
      case tok::RPAR:
      case tok::RSQB:
      case tok::RBRACE:
        return Close();
      case word::kLambda:
        return Open('l');
      case tok::COMMA:
        if (InAnnotated()) open_.back() = '(';
        return;
      case tok::COLON:
        if (!open_.empty() && open_.back() == 'l') {
          open_.pop_back();
          colon_wants_blank_ = true;
        } else {
          colon_wants_blank_ = !open_.empty() && open_.back() != '[';
          if (!open_.empty() && open_.back() == '(') open_.back() = 'a';
        }
        return;
      default:
        return;
    }
  }
  void Open(char bracket) { open_ += bracket; }
  void Close() {
    while (!open_.empty() && open_.back() == 'l') open_.pop_back();
    if (!open_.empty()) open_.pop_back();
  }

  // Copies a joined text and puts a blank behind each colon that stands outside its brackets and
  // strings.
  void AppendWithSpacedColons(Text item) {
    const auto size = static_cast<int64_t>(item.size());
    size_t copied = 0;
    int64_t depth = 0;
    for (int64_t at = 0; at < size;) {
      const auto index = static_cast<size_t>(at);
      const char byte = item[index];
      if (IsQuoteByte(byte)) {
        // A formatted string may hold its own quotes inside a field, which only a tokeniser sees
        // through: what follows one stays as it is.
        if (HasFormatPrefix(item.substr(0, index))) break;
        at = FindStringEndNonNested(item.data(), at, size);
        continue;
      }
      const Edge edge = SideOfByte(byte).edge;
      if (edge == Edge::kOpen) ++depth;
      if (edge == Edge::kClose) --depth;
      ++at;
      if (edge == Edge::kColon && depth == 0 && at < size && item[index + 1] != '=' && !IsSpaceByte(item[index + 1])) {
        out_ += item.substr(copied, index + 1 - copied);
        out_ += ' ';
        copied = index + 1;
      }
    }
    out_ += item.substr(copied);
  }

  // Whether a quote behind `before` begins a formatted string.
  static bool HasFormatPrefix(Text before) {
    for (size_t at = before.size(); at > 0 && IsIdentifierByte(before[at - 1]); --at) {
      const char letter = static_cast<char>(before[at - 1] | 0x20);
      if (letter == 'f' || letter == 't') return true;
    }
    return false;
  }

  std::string& out_;
  Text previous_;
  Side last_;
  bool last_is_unary_ = false;
  bool colon_wants_blank_ = false;
  std::string open_;  // by first bytes; 'l' for a lambda, 'a' for a "(" with an annotation behind its last comma
};

}  // namespace

void AppendJoinedTokens(const Text* items, size_t count, std::string& out) {
  Joiner joiner(out);
  for (size_t i = 0; i < count; ++i) joiner.Add(items[i]);
}

void AppendJoinedTokens(const Text* items, const TokenCode* codes, size_t count, std::string& out) {
  Joiner joiner(out);
  for (size_t i = 0; i < count; ++i) joiner.Add(items[i], codes[i]);
}

}  // namespace quillet
