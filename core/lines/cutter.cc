// The client of the scanner that cuts its tokens into statements, and settles what each one is.
//
// The scanner says where lines end and where outside brackets ":", "=" and ";" stand; from these few
// indices and the first token follows the kind of almost every statement without a second look at
// its tokens. The second look is taken where a definition has its body on the line, where a lambda
// may own the ":" or "=", and where a statement holds a string that may be a type hint.
#include "lines/cutter.h"

#include <algorithm>

#include "lines/token_search.h"
#include "lines/unusual_tokens.h"
#include "tokens/scanner.h"

namespace quillet {

namespace {

constexpr uint32_t kNowhere = UINT32_MAX;

// What is known of a statement's tokens. Indices count the source's tokens.
struct StatementFacts {
  uint32_t first_assign = kNowhere;  // outside brackets; a lambda may own it
  uint32_t first_colon = kNowhere;   // likewise
  uint32_t last_string = kNowhere;
  bool has_formatted_string = false;
  bool has_type_comment = false;
  uint8_t words = UnusualTokens::kAllWords;  // that it may hold

  void Assign(uint32_t index) { first_assign = std::min(first_assign, index); }
  void Colon(uint32_t index) { first_colon = std::min(first_colon, index); }
  void String(uint32_t index, bool formatted) {
    last_string = index;
    has_formatted_string |= formatted;
  }
  void Comment(Text comment) { has_type_comment |= comment.find("type:") != Text::npos; }
};

bool IsFormatted(Text string) {
  const size_t prefix_length = std::min(string.find('"'), string.find('\''));
  return prefix_length != Text::npos && PrefixOf(string.data(), prefix_length).formatted;
}

// The facts of tokens that the scanner did not report as a statement of their own.
StatementFacts FactsOf(TokenSpan toks, uint32_t begin, uint32_t end) {
  StatementFacts facts;
  size_t depth = 0;
  for (uint32_t i = begin; i < end; ++i) {
    const TokenCode code = toks[i].code;
    if (IsOpeningBracket(code)) ++depth;
    if (IsClosingBracket(code) && depth > 0) --depth;
    if (code == tok::STRING) facts.String(i, IsFormatted(toks[i].view()));
    if (code == tok::COMMENT) facts.Comment(toks[i].view());
    if (depth == 0 && code == tok::COLON) facts.Colon(i);
    if (depth == 0 && IsAssignment(code) && toks[i].view() != "->") facts.Assign(i);
  }
  return facts;
}

// One statement's tokens and the questions about them.
class Statement {
 public:
  Statement(TokenSpan toks, uint32_t begin, uint32_t end, const StatementFacts& facts, bool python2)
      : toks_(toks), begin_(begin), end_(end), facts_(facts), python2_(python2) {
    first_ = NextSignificant(toks_, begin_, end_);
    if (CodeAt(first_) != word::kAsync) {
      lead_ = CodeAt(first_);
    } else {
      const TokenCode next = CodeAt(Next(first_));
      is_async_ = next == word::kDef || next == word::kFor || next == word::kWith;
      lead_ = is_async_ ? next : CodeAt(first_);
    }
  }

  TokenCode lead() const { return lead_; }
  bool is_async() const { return is_async_; }
  bool IsDefinition() const { return lead_ == word::kDef || lead_ == word::kClass; }

  // Where the body of a definition on its own line begins, or the end.
  uint32_t InlineBody() const {
    if (facts_.first_colon == kNowhere || facts_.first_colon + 1 == end_) return end_;
    const size_t body = HeadColon(toks_, first_, end_) + 1;
    return NextSignificant(toks_, body, end_) < end_ ? static_cast<uint32_t>(body) : end_;
  }

  [[gnu::always_inline]] inline LineKind Kind() const {
    switch (lead_) {
      case word::kAssert:
        return LineKind::kAssert;
      case word::kBreak:
        return LineKind::kBreak;
      case word::kClass:
        return LineKind::kClassDef;
      case word::kContinue:
        return LineKind::kContinue;
      case word::kDef:
        return LineKind::kFunctionDef;
      case word::kDel:
        return LineKind::kDelete;
      case word::kElif:
        return LineKind::kElifBeginning;
      case word::kElse:
        return LineKind::kElseBeginning;
      case word::kExcept:
        return LineKind::kExcept;
      case word::kFinally:
        return LineKind::kFinally;
      case word::kFor:
        return LineKind::kForBeginning;
      case word::kFrom:
        return LineKind::kFromImport;
      case word::kIf:
        return LineKind::kIfBeginning;
      case word::kImport:
        return LineKind::kImport;
      case word::kPass:
        return LineKind::kPass;
      case word::kRaise:
        return LineKind::kRaise;
      case word::kReturn:
        return LineKind::kReturn;
      case word::kTry:
        return LineKind::kTry;
      case word::kWhile:
        return LineKind::kWhileBeginning;
      case word::kWith:
        return LineKind::kWith;
      case word::kCase:
      case word::kMatch: {
        const LineKind kind = FindMatchOrCaseType(toks_, first_, end_);
        return kind != LineKind::kUnknown ? kind : SimpleKind();
      }
      case word::kPrint:
        return IsPrintStatement() ? LineKind::kPrint : SimpleKind();
      case word::kType:
        return IsTypeStatement() ? LineKind::kTypeStatement : SimpleKind();
      case tok::STRING:
        return IsAllStrings() ? LineKind::kStringExpression : SimpleKind();
      default:
        return SimpleKind();
    }
  }

  // False where a token holds, or may hold, an expression of its own.
  bool HasNoEmbedded(LineKind kind) const {
    if (facts_.has_formatted_string || facts_.has_type_comment) return false;
    return facts_.last_string == kNowhere || !MayHoldStringHint(kind);
  }

 private:
  TokenCode CodeAt(size_t i) const { return i < end_ ? toks_[i].code : tok::ENDMARKER; }
  size_t Next(size_t i) const { return NextSignificant(toks_, i + 1, end_); }

  // An expression or an assignment.
  LineKind SimpleKind() const {
    const uint32_t decisive = std::min(facts_.first_assign, facts_.first_colon);
    if (decisive == kNowhere) return LineKind::kUnknown;
    if ((facts_.words & UnusualTokens::kLambda) == 0 || !HasWord(word::kLambda, decisive)) return LineKind::kAssignment;
    const size_t own = VisitOwnTokens(
        toks_, first_, end_, [this](size_t i) { return !IsAssignment(toks_[i].code) && toks_[i].code != tok::COLON; });
    return own < end_ ? LineKind::kAssignment : LineKind::kUnknown;
  }

  bool IsPrintStatement() const {
    const TokenCode next = CodeAt(Next(first_));
    return python2_ && next != tok::EQUAL && next != tok::DOT;
  }

  bool IsTypeStatement() const {
    const size_t name = Next(first_);
    switch (CodeAt(name)) {
      case tok::NAME:
      case word::kCase:
      case word::kCast:
      case word::kExec:
      case word::kMatch:
      case word::kPrint:
      case word::kType:
      case word::kUnderscore:
        break;
      default:
        return false;
    }
    const TokenCode next = CodeAt(Next(name));
    return next == tok::EQUAL || next == tok::LSQB;
  }

  bool IsAllStrings() const {
    return std::all_of(toks_.begin() + first_, toks_.begin() + end_,
                       [](const Token& token) { return token.code == tok::STRING || IsSkipCode(token.code); });
  }

  // Whether the code stands in front of a token.
  bool HasWord(TokenCode code, uint32_t in_front_of) const {
    return std::any_of(toks_.begin() + begin_, toks_.begin() + in_front_of,
                       [code](const Token& token) { return token.code == code; });
  }

  // An annotation follows a ":" (outside brackets, but for parameters) or a "->", and a hint that is
  // an argument belongs to `cast`.
  bool MayHoldStringHint(LineKind kind) const {
    if (kind == LineKind::kTypeStatement) return true;
    if (facts_.first_colon < facts_.last_string) return true;
    if ((facts_.words & UnusualTokens::kCast) != 0 && HasWord(word::kCast, facts_.last_string)) return true;
    return IsDefinition() && (HasWord(tok::COLON, facts_.last_string) || HasWord(tok::RARROW, facts_.last_string));
  }

  TokenSpan toks_;
  uint32_t begin_;
  uint32_t end_;
  const StatementFacts& facts_;
  bool python2_;
  bool is_async_ = false;
  size_t first_;    // the first significant token
  TokenCode lead_;  // its code, or that of the word behind `async`
};

// In the place of UnusualTokens for who does not want to know.
struct NoUnusualTokens : SeesNoTokens {
  static constexpr uint8_t kGoesOn = 0;
  explicit NoUnusualTokens(Version) {}
  void SeePlace() {}
  void SeeEndOfImport(const Token&) {}
  uint8_t words() const { return UnusualTokens::kAllWords; }
  uint8_t SeeStatement(TokenCode, uint32_t) { return 0; }
  void Reset() {}
};

// `Unusual`: what looks at each token of a statement.
template <class Unusual>
class Cutter : public Unusual {
 public:
  Cutter(Version version, std::vector<LineRow>& rows, size_t most_memory)
      : Unusual(version), python2_(!version.AtLeast(3, 0)), rows_(rows), most_memory_(most_memory) {}

  // ---- what the scanner calls ----

  void BlankLine(uint32_t indent, const ScanOutput& out) {
    Add({out.token_count(), 0, out.line(), out.line(), indent, LineKind::kBlankLine, false, false, false, true,
         Unusual::kGoesOn},
        out);
  }

  void CommentLine(uint32_t indent, const ScanOutput& out) {
    Add({out.token_count() - 1, 1, out.line(), out.line(), indent, LineKind::kComment, false, false, false,
         !facts_.has_type_comment, Unusual::kGoesOn},
        out);
    facts_ = {};
  }

  void BeginStatement(uint32_t indent, uint32_t bytes, const ScanOutput& out) {
    indent_ = indent;
    if (bytes != indent) [[unlikely]]
      this->SeePlace();
    BeginPiece(false, out);
  }

  // What lacks a text in front of its ";" (nothing there, or a head without its body) gets a row that
  // holds the ";", which no grammar takes for a statement.
  bool Separator(const ScanOutput& out) {
    const TokenCode last = LastSignificantCode(out);
    if (last == tok::ENDMARKER) return false;
    EndStatement(out);
    BeginPiece(true, out);
    return last != tok::COLON;
  }

  void KeptSeparator(const ScanOutput& out) {
    EndStatement(out);
    BeginPiece(true, out);
  }

  void EndStatement(const ScanOutput& out) {
    const TokenSpan toks(out.tokens(), out.token_count());
    const auto end = static_cast<uint32_t>(toks.size());
    if (first_ < end) {
      if (continues_ && NextSignificant(toks, first_, end) == end) {
        ExtendLastRow(end - first_, LastLine(toks, end, out));
      } else {
        AddRows(toks, end, out);
      }
    }
    facts_ = {};
    this->Reset();
  }

  // Broken code: brackets that were never closed end in front of a line that is indented no deeper
  // than their statement and begins with a word that no expression holds.
  bool ClosesBrackets(const char* line) const {
    uint32_t indent;
    const char* at = IndentEnd(line, indent);
    if (indent > indent_) return false;
    const TokenCode code = NameCodeAt(at);
    if (code == word::kAsync) {
      const TokenCode next = NameCodeAt(BlanksEnd(at + 5));
      return next == word::kDef || next == word::kWith;
    }
    return OnlyBeginsStatement(code) || (code == word::kNonlocal && !python2_);
  }

  void Assign(uint32_t index) { facts_.Assign(index); }
  void Colon(uint32_t index) { facts_.Colon(index); }
  void String(uint32_t index, bool formatted) { facts_.String(index, formatted); }
  void Comment(Text comment) { facts_.Comment(comment); }

 private:
  void BeginPiece(bool continues, const ScanOutput& out) {
    first_ = out.token_count();
    first_line_ = out.line();
    continues_ = continues;
    if (continues) this->SeePlace();
  }

  TokenCode LastSignificantCode(const ScanOutput& out) const {
    for (uint32_t i = out.token_count(); i-- > first_;) {
      if (!IsSkipCode(out.tokens()[i].code)) return out.tokens()[i].code;
    }
    return tok::ENDMARKER;
  }

  // The line on which the last token in front of `end` ends.
  static uint32_t LastLine(TokenSpan toks, uint32_t end, const ScanOutput& out) {
    uint32_t line = out.line();
    while (out.LineStart(line) >= toks[end - 1].end()) --line;
    return line;
  }

  // A comment, or a backslash that joins nothing, behind the last ";" of a line.
  void ExtendLastRow(uint32_t count, uint32_t last_line) {
    LineRow& row = rows_.back();
    row.token_count += count;
    row.last_line = last_line;
    row.no_embedded = row.no_embedded && !facts_.has_type_comment;
  }

  // The rows of the tokens from first_ up to `end`: one, or two for a definition with its body on the
  // line. A definition as such a body is no Python, and stays whole.
  void AddRows(TokenSpan toks, uint32_t end, const ScanOutput& out) {
    facts_.words = this->words();
    const Statement statement(toks, first_, end, facts_, python2_);
    const uint32_t body = statement.IsDefinition() ? statement.InlineBody() : end;
    if (body == end) return AddRow(statement, toks, end, false, out);
    this->SeePlace();
    const StatementFacts head_facts = FactsOf(toks, first_, body);
    AddRow(Statement(toks, first_, body, head_facts, python2_), toks, body, true, out);
    const StatementFacts body_facts = FactsOf(toks, body, end);
    while (first_line_ < out.line() && out.LineStart(first_line_ + 1) <= toks[body].text) ++first_line_;
    first_ = body;
    continues_ = true;
    AddRow(Statement(toks, body, end, body_facts, python2_), toks, end, false, out);
  }

  void AddRow(const Statement& statement, TokenSpan toks, uint32_t end, bool has_inline_body, const ScanOutput& out) {
    const LineKind kind = statement.Kind();
    if (kind == LineKind::kFromImport) this->SeeEndOfImport(toks[end - 1]);
    Add({first_, end - first_, first_line_, LastLine(toks, end, out), indent_, kind, continues_, has_inline_body,
         statement.is_async(), statement.HasNoEmbedded(kind), this->SeeStatement(statement.lead(), indent_)},
        out);
  }

  void Add(const LineRow& row, const ScanOutput& out) {
    if (rows_.size() == rows_.capacity()) [[unlikely]]
      GrowRows(out);
    rows_.push_back(row);
  }

  [[gnu::noinline]] void GrowRows(const ScanOutput& out) {
    const size_t more = rows_.size() / 2 + 64;
    // For a moment both the old and the new memory is there.
    const size_t memory = sizeof(Token) * out.token_count() + sizeof(LineRow) * (2 * rows_.size() + more);
    if (memory > most_memory_) ThrowError(ErrorKind::kOverflowError, "the source holds too many statements");
    rows_.reserve(rows_.size() + more);
  }

  const bool python2_;
  std::vector<LineRow>& rows_;
  const size_t most_memory_;
  StatementFacts facts_;     // of the tokens since first_
  uint32_t first_ = 0;       // the first token of the statement under way
  uint32_t first_line_ = 0;  // its line
  uint32_t indent_ = 0;
  bool continues_ = false;
};

template <class Client>
void Scan(SourceText& source, Version version, size_t most_memory, Client& client, bool templates = false) {
  Scanner<Client>(source.text(), version.AtLeast(3, 12), source.tokens, source.line_starts, client,
                  most_memory / sizeof(Token), templates)
      .Run();
}

}  // namespace

void CutLines(SourceText& source, Version version, std::vector<LineRow>& rows, size_t most_memory) {
  Cutter<NoUnusualTokens> cutter(version, rows, most_memory);
  Scan(source, version, most_memory, cutter);
}

void CutLinesCompletely(SourceText& source, Version version, std::vector<LineRow>& rows, size_t most_memory) {
  Cutter<UnusualTokens> cutter(version, rows, most_memory);
  Scan(source, version, most_memory, cutter, version.AtLeast(3, 14));
}

void TokenizeOnly(SourceText& source, Version version) {
  TokensOnly client;
  Scan(source, version, SIZE_MAX, client);
}

bool IsScopeStartLogical(const LogicalLine& line) {
  if (line.kind == LineKind::kFunctionDef || line.kind == LineKind::kClassDef) return true;
  const auto count = static_cast<uint32_t>(line.toks.size());
  const StatementFacts no_facts;
  return Statement(line.toks, 0, count, no_facts, false).IsDefinition();
}

}  // namespace quillet
