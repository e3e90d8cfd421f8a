// A line within a function defines nothing of the kind unless it begins a class or a function of its own, so what is
// looked at word by word is a small part of a source. Strings are passed over as the tokeniser does it. Within
// functions brackets are not counted: a line that goes on with a statement may be taken for one that ends the function,
// behind which names are found that are none, but none is missed.
#include "program/possible_symbols.h"

#include "foundations/stop.h"
#include "program/blanks.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

constexpr size_t kSpare = 64;  // zeros that scans may load
constexpr int64_t kBytesOfAStep = 16;

bool IsHigh(char c) { return static_cast<unsigned char>(c) >= 0x80; }
bool IsPartOfWord(char c) { return IsAsciiIdentifierByte(c) || IsHigh(c); }

bool Is(const char* begin, const char* end, Text word) { return Text(begin, static_cast<size_t>(end - begin)) == word; }

bool IsClosing(char c) { return c == ')' || c == ']' || c == '}'; }

bool BeginsDefinition(const char* at) {
  const TokenCode code = NameCodeAt(at);
  return code == word::kDef || code == word::kClass || code == word::kAsync;
}

// Over blanks and lines that are joined by a backslash.
const char* SkipBlanks(const char* at) {
  while (true) {
    if (IsBlank(*at)) {
      ++at;
    } else if (*at == '\\' && IsLineEnd(at[1])) {
      at = LineEndEnd(at + 1);
    } else {
      return at;
    }
  }
}

}  // namespace

bool PossibleSymbols::Read(std::string& source, Version version) {
  version_ = version;
  symbols_.clear();
  blocks_.clear();
  if (!version_.AtLeast(3, 0)) return false;  // comprehensions bind names of what is around them
  const size_t size = source.size();
  source.append(kSpare, '\0');
  begin_ = source.data();
  end_ = begin_ + size;
  const bool is_told = ReadLines();
  if (is_told) ReadNamedExpressions();
  source.resize(size);
  return is_told;
}

bool PossibleSymbols::ReadLines() {
  static constexpr Text kMark = "\xEF\xBB\xBF";
  const char* at = begin_;
  if (Text(at, static_cast<size_t>(end_ - at)).starts_with(kMark)) at += kMark.size();
  for (const char* counted = at; at < end_;) {
    uint32_t indent;
    const char* const first = IndentEnd(at, indent);
    at = ReadLine(first, indent);
    if (at == nullptr) return false;
    if (at - counted > int64_t{1} << 14) {
      CountSteps((at - counted) / kBytesOfAStep);
      counted = at;
    }
  }
  return true;
}

// The targets of one statement outside of functions, or of what stands on the line of a head.
class PossibleSymbols::Statement {
 public:
  Statement(PossibleSymbols& all, uint32_t indent) : all_(all), indent_(indent), kept_(all.symbols_.size()) {}

  // To the line behind it; null where that is not told.
  const char* Read(const char* at) {
    while (true) {
      const char byte = *at;
      is_behind_dot_ = before_ == '.';
      if (IsAsciiIdentifierByte(byte)) {
        const char* const end = AsciiIdentifierEnd(at);
        if (IsHigh(*end)) return nullptr;
        before_ = 'a';
        at = IsAsciiDigit(byte) ? end : Word(at, end);
        if (at == nullptr) return nullptr;
        continue;
      }
      switch (byte) {
        case ' ':
        case '\t':
        case '\f':
          ++at;
          continue;
        case '\\':
          at = IsLineEnd(at[1]) ? LineEndEnd(at + 1) : at + 1;
          continue;
        case '\n':
        case '\r':
          at = LineEndEnd(at);
          if (depth_ == 0) return End(at);
          if (ClosesBrackets(at)) return nullptr;  // behind a bracket that was never closed anything may stand
          continue;
        case '#':
          at = FindAny<'\n', '\r'>(at, all_.end_);
          continue;
        case '"':
        case '\'':
          at = all_.StringEnd(at);
          if (at == nullptr) return nullptr;
          before_ = 'a';
          continue;
        case '\0':
          return at >= all_.end_ && depth_ == 0 ? End(at) : nullptr;
        case '$':
        case '?':
        case '`':
          return nullptr;
        case '(':
        case '[':
        case '{':
          // What is given to a call or taken from a value is no target.
          if (ignored_from_ == 0 && part_ != Part::kPattern && (before_ == 'a' || before_ == ')'))
            ignored_from_ = depth_ + 1;
          ++depth_;
          break;
        case ')':
        case ']':
        case '}':
          if (depth_ == 0) return nullptr;
          if (depth_ == ignored_from_) ignored_from_ = 0;
          --depth_;
          if (depth_ < alias_depth_) part_ = Part::kHead;
          before_ = ')';
          ++at;
          continue;
        case ',':
          if (part_ == Part::kAlias && depth_ <= alias_depth_) part_ = Part::kHead;
          break;
        case ';':
          if (depth_ == 0) Begin();
          break;
        case ':':
          if (at[1] == '=') {  // read elsewhere
            ++at;
          } else if (depth_ == 0) {
            Colon();
          }
          break;
        case '=':
          if (at[1] == '=') {
            ++at;
          } else if (depth_ == 0 && !IsComparison(at)) {
            if (IsInHead()) return nullptr;
            Keep();
          }
          break;
        default:
          if (IsHigh(byte)) return nullptr;
          break;
      }
      before_ = byte;
      ++at;
    }
  }

 private:
  enum class Part : uint8_t {
    kFirst,    // nothing was read
    kTargets,  // what an assignment may follow
    kValue,    // of an annotation and behind it: nothing is bound
    kHead,     // of a statement that others follow
    kLoop,     // the targets of `for`
    kAlias,    // behind `as`
    kPattern,  // of `case`
  };

  void Begin() {
    Drop();
    part_ = Part::kFirst;
    before_ = '\n';
    ignored_from_ = 0;
    alias_depth_ = 0;
  }
  // A head without its colon is none that lines tell of.
  const char* End(const char* at) {
    Drop();
    return IsInHead() || part_ == Part::kPattern ? nullptr : at;
  }
  bool IsInHead() const { return part_ == Part::kHead || part_ == Part::kLoop || part_ == Part::kAlias; }

  // To behind the word, and behind the name where it begins a definition.
  const char* Word(const char* at, const char* end) {
    const Text word(at, static_cast<size_t>(end - at));
    const bool is_behind_dot = is_behind_dot_;
    if (word == "def" || word == "class") {
      Drop();
      part_ = Part::kHead;
      const char* const behind = all_.ReadNameBehind(end);
      Keep();
      all_.is_in_block_ = true;
      return behind;
    }
    if (part_ == Part::kFirst) {
      const char next = *SkipBlanks(end);
      const bool is_name = word == "case" && (next == '=' || next == ':' || next == '.');
      part_ = is_name ? Part::kTargets : PartBehind(word);
      if (part_ != Part::kTargets) {
        before_ = ' ';
        return end;
      }
    }
    if (is_behind_dot || ignored_from_ != 0) return end;
    if ((word == "as" && part_ != Part::kValue && part_ != Part::kPattern) || (word == "in" && part_ == Part::kLoop)) {
      part_ = word == "as" ? Part::kAlias : Part::kHead;
      alias_depth_ = depth_;
      before_ = ' ';
      return end;
    }
    // What stands in front of these is read, or the prefix of a string.
    const char next = *SkipBlanks(end);
    if (next == '(' || next == '.' || next == '[' || IsQuote(*end)) return end;
    if (part_ == Part::kTargets && word == "lambda") {
      Drop();
      part_ = Part::kValue;
    } else if (part_ == Part::kTargets) {
      all_.symbols_.push_back({word, true, all_.is_in_block_});
    } else if (part_ == Part::kLoop || part_ == Part::kAlias || part_ == Part::kPattern) {
      AddBound(word);
    }
    return end;
  }

  static Part PartBehind(Text word) {
    if (word == "import" || word == "from") return Part::kValue;
    if (word == "for") return Part::kLoop;
    if (word == "case") return Part::kPattern;
    if (word == "async") return Part::kFirst;
    for (const Text head : {"if", "elif", "else", "while", "with", "try", "except", "finally"})
      if (word == head) return Part::kHead;
    return Part::kTargets;
  }

  void AddBound(Text name) {
    all_.symbols_.push_back({name, true, all_.is_in_block_});
    Keep();
  }
  // What was added up to here is bound; otherwise the end of the statement takes it away.
  void Keep() { kept_ = all_.symbols_.size(); }
  void Drop() { all_.symbols_.resize(kept_, {}); }

  void Colon() {
    if (part_ != Part::kTargets && part_ != Part::kValue) return Begin();
    Keep();  // annotated
    part_ = Part::kValue;
  }

  bool IsComparison(const char* at) const {
    return before_ == '!' || ((before_ == '<' || before_ == '>') && at[-1] == before_ && at[-2] != before_);
  }

  // As the lines of statements are cut: brackets that were never closed.
  bool ClosesBrackets(const char* line) const {
    uint32_t indent;
    const char* const at = IndentEnd(line, indent);
    if (indent > indent_) return false;
    const TokenCode code = NameCodeAt(at);
    if (code == word::kAsync) {
      const TokenCode next = NameCodeAt(BlanksEnd(at + 5));
      return next == word::kDef || next == word::kWith;
    }
    return OnlyBeginsStatement(code) || code == word::kNonlocal;
  }

  PossibleSymbols& all_;
  const uint32_t indent_;
  size_t kept_;  // behind so many symbols are names that are bound where an assignment follows
  Part part_ = Part::kFirst;
  bool is_behind_dot_ = false;
  int depth_ = 0;
  int ignored_from_ = 0;  // the depth of a bracket in which nothing is bound; 0 outside of one
  int alias_depth_ = 0;
  char before_ = '\n';  // 'a' for a word or a string, a bracket, the last byte of an operator
};

const char* PossibleSymbols::ReadLine(const char* at, uint32_t indent) {
  if (IsLineEnd(*at)) return LineEndEnd(at);
  if (*at == '#') return SkipLine(at);
  if (IsClosing(*at)) {  // mostly of the head of a function
    const char* behind = at;
    while (IsClosing(*behind) || IsBlank(*behind)) ++behind;
    const bool is_odd = blocks_.empty() || !blocks_.back().is_function || BeginsDefinition(behind);
    return is_odd ? nullptr : SkipLine(at);
  }
  while (!blocks_.empty() && blocks_.back().indent >= indent) blocks_.pop_back();
  is_in_block_ = indent > 0;
  const char* word_end = AsciiIdentifierEnd(at);
  const char* definition = at;
  if (Is(at, word_end, "async")) {
    definition = SkipBlanks(word_end);
    word_end = AsciiIdentifierEnd(definition);
  }
  if (Is(definition, word_end, "def")) {
    const char* const behind = ReadNameBehind(word_end);
    blocks_.push_back({indent, true});
    return behind == nullptr ? nullptr : SkipLine(behind);
  }
  if (Is(definition, word_end, "class")) {
    blocks_.push_back({indent, false});
  } else if (!blocks_.empty() && blocks_.back().is_function) {
    return SkipLine(at);
  }
  return Statement(*this, indent).Read(at);
}

// To behind the end of a line that is not looked at.
const char* PossibleSymbols::SkipLine(const char* at) const {
  while (true) {
    at = FindAny<'\n', '\r', '#', '"', '\''>(at, end_);
    if (at >= end_) return end_;
    if (IsLineEnd(*at)) return LineEndEnd(at);
    if (*at == '#') {
      at = FindAny<'\n', '\r'>(at, end_);
    } else {
      at = StringEnd(at);
      if (at == nullptr) return nullptr;
    }
  }
}

// Behind the string whose quotes stand there; null where it does not end.
const char* PossibleSymbols::StringEnd(const char* quote) const {
  const char* prefix = quote;
  while (prefix > begin_ && quote - prefix < 3 && IsPartOfWord(prefix[-1])) --prefix;
  const Text letters(prefix, static_cast<size_t>(quote - prefix));
  const bool is_template = version_.AtLeast(3, 14) && IsTemplatePrefix(letters);
  const StringPrefix said = PrefixOf(prefix, letters.size());
  if (is_template || (said.formatted && version_.AtLeast(3, 12))) {
    const char* stop;
    return NestedFormattedStringEnd(quote, end_, is_template ? letters.size() == 2 : said.raw, stop);
  }
  return IsTripleQuote(quote) ? TripleStringEnd(quote, end_) : SingleStringEnd(quote, end_);
}

// Behind `def` and `class`: to behind the name; null where it may be longer.
const char* PossibleSymbols::ReadNameBehind(const char* at) {
  at = SkipBlanks(at);
  const char* const end = AsciiIdentifierEnd(at);
  if (IsHigh(*end)) return nullptr;
  if (end != at) symbols_.push_back({Text(at, static_cast<size_t>(end - at)), false, is_in_block_});
  return end;
}

// In front of `:=`, wherever it stands: in a comprehension or the head of a function, too.
void PossibleSymbols::ReadNamedExpressions() {
  const Text text(begin_, static_cast<size_t>(end_ - begin_));
  for (size_t at = text.find(":="); at != Text::npos; at = text.find(":=", at + 2)) {
    size_t end = at;
    while (end > 0 && (IsBlank(text[end - 1]) || IsLineEnd(text[end - 1]) || text[end - 1] == '\\')) --end;
    size_t begin = end;
    while (begin > 0 && IsAsciiIdentifierByte(text[begin - 1])) --begin;
    if (begin < end) symbols_.push_back({text.substr(begin, end - begin), true, true});
  }
}

}  // namespace quillet
