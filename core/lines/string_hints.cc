// Annotations are found by the shape of statements alone, without a parse: a parameter's behind its
// name, up to the next comma or "="; a return's behind "->"; a variable's behind the statement's own
// colon. A head's one-line body is a statement of its own. Each region is walked once, with a stack
// of what its brackets mean. It never fails: on broken code the regions are merely not those meant.
#include "lines/string_hints.h"

#include <algorithm>

#include "lines/logical_line.h"
#include "lines/token_search.h"
#include "lines/typing_names.h"
#include "tokens/operators.h"
#include "tokens/token_ends.h"

namespace quillet {

namespace {

class HintSearch {
 public:
  explicit HintSearch(TokenSpan toks, const TypingNames* typing = nullptr)
      : toks_(toks), count_(toks.size()), typing_(typing) {}

  struct Hint {
    size_t token;
    bool may_be_text;

    friend bool operator<(const Hint& a, const Hint& b) { return a.token < b.token; }
  };

  void Run() {
    for (size_t i = NextSignificant(toks_, 0, count_); i < count_; i = NextSignificant(toks_, i, count_))
      i = Statement(i);
    Casts();
    std::sort(hints_.begin(), hints_.end());
  }
  void RunOnType() { Region(0, count_); }
  const std::vector<Hint>& hints() const { return hints_; }

 private:
  TokenCode CodeAt(size_t i) const { return i < count_ ? toks_[i].code : tok::ENDMARKER; }
  size_t Next(size_t i) const { return NextSignificant(toks_, i + 1, count_); }

  // Takes the statement or head at `i`; returns where the next one begins.
  size_t Statement(size_t i) {
    if (CodeAt(i) == word::kAsync) i = Next(i);
    switch (CodeAt(i)) {
      case word::kDef:
        return Definition(i);
      case word::kClass:
      case word::kElif:
      case word::kElse:
      case word::kExcept:
      case word::kFinally:
      case word::kFor:
      case word::kIf:
      case word::kTry:
      case word::kWhile:
      case word::kWith:
        return HeadColon(toks_, i, count_) + 1;
      case word::kCase:
      case word::kMatch:
        if (FindMatchOrCaseType(toks_, i, count_) != LineKind::kUnknown) return HeadColon(toks_, i, count_) + 1;
        return SimpleStatement(i);
      default:
        return SimpleStatement(i);
    }
  }

  size_t SimpleStatement(size_t i) {
    bool is_decided = !MayBeTarget(i);
    size_t annotation = count_;
    const size_t stop = VisitOwnTokens(toks_, i, count_, [&](size_t at) {
      const TokenCode code = toks_[at].code;
      if (code == tok::SEMI) return false;
      if (!is_decided && (code == tok::COLON || IsAssignment(code) || code == word::kLambda)) {
        is_decided = true;
        if (code == tok::COLON) annotation = at + 1;
      }
      return true;
    });
    if (annotation < count_) Region(annotation, stop);
    return stop + 1;
  }

  // Whether an annotated target may begin here: a name, alone or with trailers, or a bracket.
  bool MayBeTarget(size_t i) const {
    if (CodeAt(i) == tok::LPAR) return true;
    if (!IsNameCode(CodeAt(i)) || OnlyBeginsStatement(CodeAt(i))) return false;
    const TokenCode next = CodeAt(Next(i));
    return next == tok::COLON || next == tok::DOT || next == tok::LSQB || next == tok::LPAR;
  }

  // `def name [type parameters] (parameters) -> type :`
  size_t Definition(size_t i) {
    i = Next(Next(i));
    if (CodeAt(i) == tok::LSQB) i = NextSignificant(toks_, BehindBracket(toks_, i, count_), count_);
    if (CodeAt(i) == tok::LPAR) i = Parameters(i + 1);
    i = NextSignificant(toks_, i, count_);
    if (CodeAt(i) == tok::RARROW) i = Region(i + 1, count_);
    return HeadColon(toks_, i, count_) + 1;
  }

  // From behind the "(" to behind the ")".
  size_t Parameters(size_t i) {
    for (;;) {
      i = NextSignificant(toks_, i, count_);
      const TokenCode code = CodeAt(i);
      if (i >= count_) return count_;
      if (code == tok::RPAR) return i + 1;
      if (code == tok::STAR || code == tok::DOUBLESTAR) {
        ++i;
        continue;
      }
      if (IsNameCode(code) && CodeAt(Next(i)) == tok::COLON) i = Region(Next(i) + 1, count_);
      i = EndOfParameter(i);
    }
  }

  // Behind the comma that ends a parameter, or at the bracket that ends them all.
  size_t EndOfParameter(size_t i) const {
    const size_t stop = VisitOwnTokens(toks_, i, count_, [this](size_t at) {
      return toks_[at].code != tok::COMMA && !IsClosingBracket(toks_[at].code);
    });
    if (CodeAt(stop) == tok::COMMA) return stop + 1;
    // A bracket of another kind closes the parameters of broken code.
    return stop < count_ && toks_[stop].code != tok::RPAR ? count_ : stop;
  }

  // All calls of `cast` in one pass, however they are nested.
  void Casts() {
    brackets_.clear();
    size_t previous = count_;  // the significant token in front, and the one in front of that
    size_t before_previous = count_;
    for (size_t i = NextSignificant(toks_, 0, count_); i < count_; i = Next(i)) {
      const TokenCode code = toks_[i].code;
      if (code == tok::LPAR && IsCast(previous, before_previous))
        brackets_.push_back({Meaning::kFirstOnly, true, false});
      else if (IsOpeningBracket(code))
        OpenBracket(code, previous, false);
      else if (IsClosingBracket(code) && !brackets_.empty())
        brackets_.pop_back();
      else if (code == tok::COMMA)
        AddComma();
      else if (code == tok::STRING && !brackets_.empty() && brackets_.back().holds_types && IsWholeType(i, previous))
        AddHint(i);
      before_previous = previous;
      previous = i;
    }
  }

  // `cast` as a call of its own or of `typing`; not as the name of what is defined, nor as another
  // object's method.
  bool IsCast(size_t name, size_t before_name) const {
    if (typing_ != nullptr) return name < count_ && IsImportedCast(name, before_name);
    if (CodeAt(name) != word::kCast) return false;
    const TokenCode front = CodeAt(before_name);
    if (front == word::kDef || front == word::kClass) return false;
    if (front != tok::DOT) return true;
    size_t owner = before_name;
    while (owner > 0 && (--owner, toks_[owner].removed() || IsSkipCode(toks_[owner].code))) {
    }
    return toks_[owner].view() == "typing";
  }

  bool IsImportedCast(size_t name, size_t before_name) const {
    if (!IsNameCode(toks_[name].code)) return false;
    const TokenCode front = CodeAt(before_name);
    if (front == word::kDef || front == word::kClass) return false;
    return MemberAt(name, front == tok::DOT) == "cast";
  }

  // What the module of types calls the name at `i`; empty for any other name.
  Text MemberAt(size_t i, bool is_attribute) const {
    const Text name = toks_[i].view();
    if (!is_attribute) return typing_->MemberOf(name);
    const size_t dot = Before(i);
    const size_t owner = dot < count_ ? Before(dot) : count_;
    return owner < count_ && typing_->IsModule(toks_[owner].view()) ? name : Text("");
  }
  size_t Before(size_t i) const {
    while (i > 0) {
      --i;
      if (!toks_[i].removed() && !IsSkipCode(toks_[i].code)) return i;
    }
    return count_;
  }

  // What the text in a bracket is: types, types up to the first comma, or values.
  enum class Meaning : uint8_t { kTypes, kFirstOnly, kValues };
  struct Bracket {
    Meaning meaning;
    bool holds_types;  // it and all around it, from here on
    bool may_be_text;  // it or one around it is a subscript of what nobody knows
  };

  void AddHint(size_t i) { hints_.push_back({i, !brackets_.empty() && brackets_.back().may_be_text}); }

  void OpenBracket(TokenCode code, size_t previous, bool outermost_holds_types) {
    const Meaning meaning = MeaningOf(code, previous);
    const bool around = brackets_.empty() ? outermost_holds_types : brackets_.back().holds_types;
    const bool may_be_text = (!brackets_.empty() && brackets_.back().may_be_text) || IsUnknownSubscript(code, previous);
    brackets_.push_back({meaning, around && meaning != Meaning::kValues, may_be_text});
  }

  void AddComma() {
    if (!brackets_.empty() && brackets_.back().meaning == Meaning::kFirstOnly) brackets_.back().holds_types = false;
  }

  bool IsUnknownSubscript(TokenCode code, size_t previous) const {
    if (typing_ == nullptr || code != tok::LSQB || previous >= count_ || !IsNameCode(toks_[previous].code))
      return false;
    const size_t front = Before(previous);
    return MemberAt(previous, front < count_ && toks_[front].code == tok::DOT).empty();
  }

  Meaning MeaningOf(TokenCode code, size_t previous) const {
    const TokenCode front = CodeAt(previous);
    const bool follows_value = IsNameCode(front) || front == tok::RPAR || front == tok::RSQB;
    if (code == tok::LPAR) return follows_value ? Meaning::kValues : Meaning::kTypes;
    if (code == tok::LBRACE) return Meaning::kValues;
    Text name = follows_value ? toks_[previous].view() : Text();
    if (typing_ != nullptr && !name.empty()) {
      const size_t before = Before(previous);
      const Text member = MemberAt(previous, before < count_ && toks_[before].code == tok::DOT);
      if (!member.empty()) name = member;
    }
    if (name == "Literal") return Meaning::kValues;
    return name == "Annotated" ? Meaning::kFirstOnly : Meaning::kTypes;
  }

  // Collects the hints of the annotation at `i`, which ends at the first token outside of its
  // brackets that cannot be part of it; returns where.
  size_t Region(size_t i, size_t end) {
    brackets_.clear();
    size_t previous = count_;
    for (i = NextSignificant(toks_, i, end); i < end; i = NextSignificant(toks_, i + 1, end)) {
      const TokenCode code = toks_[i].code;
      if (IsOpeningBracket(code)) {
        OpenBracket(code, previous, true);
      } else if (IsClosingBracket(code)) {
        if (brackets_.empty()) return i;
        brackets_.pop_back();
      } else if (brackets_.empty()) {
        if (code == tok::COMMA || code == tok::COLON || code == tok::SEMI || code == tok::EQUAL) return i;
      } else if (code == tok::COMMA) {
        AddComma();
      }
      const bool holds_types = brackets_.empty() || brackets_.back().holds_types;
      if (code == tok::STRING && holds_types && IsWholeType(i, previous)) AddHint(i);
      previous = i;
    }
    return end;
  }

  bool IsWholeType(size_t i, size_t previous) const {
    switch (CodeAt(previous)) {
      case tok::ENDMARKER:
      case tok::LSQB:
      case tok::LPAR:
      case tok::COMMA:
      case tok::VBAR:
        break;
      default:
        return false;
    }
    switch (CodeAt(Next(i))) {
      case tok::ENDMARKER:
      case tok::RSQB:
      case tok::RPAR:
      case tok::COMMA:
      case tok::VBAR:
      case tok::EQUAL:
      case tok::COLON:
      case tok::SEMI:
        return true;
      default:
        return false;
    }
  }

  TokenSpan toks_;
  size_t count_;
  const TypingNames* typing_;  // null: names are taken at their word
  std::vector<Hint> hints_;
  std::vector<Bracket> brackets_;
};

}  // namespace

void FindStringHints(TokenSpan toks, std::vector<size_t>& hints) {
  HintSearch search(toks);
  search.Run();
  for (const HintSearch::Hint& hint : search.hints()) hints.push_back(hint.token);
}

void FindStringHints(TokenSpan toks, const TypingNames& typing, std::vector<size_t>& hints,
                     std::vector<bool>& may_be_text) {
  HintSearch search(toks, &typing);
  search.Run();
  for (const HintSearch::Hint& hint : search.hints()) {
    hints.push_back(hint.token);
    may_be_text.push_back(hint.may_be_text);
  }
}

void FindStringHintsOfType(TokenSpan toks, std::vector<size_t>& hints) {
  HintSearch search(toks);
  search.RunOnType();
  for (const HintSearch::Hint& hint : search.hints()) hints.push_back(hint.token);
}

Text ContentsOfStringHint(const Token& string) {
  const Text text = string.view();
  size_t prefix_length = 0;
  while (prefix_length < text.size() && !IsQuote(text[prefix_length])) {
    const char letter = static_cast<char>(text[prefix_length++] | 0x20);
    if (letter != 'r' && letter != 'u') return kNoText;
  }
  const Text quoted = text.substr(prefix_length);
  if (quoted.size() < 2 || quoted.find('\\') != Text::npos) return kNoText;
  const size_t quotes = quoted.size() >= 6 && IsTripleQuote(quoted.data()) ? 3 : 1;
  return quoted.substr(quotes, quoted.size() - 2 * quotes);
}

}  // namespace quillet
