// The names of statements, from their tokens: what each one does, and in which scope it stands.
//
// A statement is read from left to right, once, over a stack of what is open: brackets, lambdas, the
// head of a definition. What an open thing is says what a name in it does. Three roles become known
// behind a name. A call is a "(" that follows. A target is kept as a candidate until a "=" (or the
// "in" of a loop) makes a write of it; what is left over was read. And an element in front of the
// "for" of a comprehension stands in the comprehension's scope: which brackets hold a "for" is looked
// up in front. Nothing recurses but strings in strings, whose depth is bounded; code that is broken
// takes the same way, with the nearest meaning.
#pragma once

#include <array>
#include <cstdint>
#include <deque>
#include <span>
#include <vector>

#include "lines/cutter.h"
#include "lines/fstring_fields.h"
#include "lines/row_pieces.h"
#include "names/bindings.h"
#include "names/symbol_table.h"

namespace quillet {

class NameReader {
 public:
  NameReader(Version version, SymbolTable& symbols, Bindings& out);

  void Read(const SourceText& source, std::span<const LineRow> rows);

 private:
  // What a token is to the reader; one for each code, by version.
  enum class Mark : uint8_t {
    kName,
    kConstant,
    kString,
    kOpen,
    kClose,
    kDot,
    kComma,
    kColon,
    kEqual,
    kAssign,  // with an operation; "->" shares the code of one
    kLambda,
    kFor,
    kIn,
    kIf,
    kAs,
    kAsync,  // may be a name
    kAwait,  // likewise
    kDoubleStar,
    kBackquote,
    kDefinition,
    kOperator,  // keywords too, and what is no token
    kSkip,
  };

  // What stands in front of a token.
  enum class Front : uint8_t { kOperator, kValue, kDot };

  struct Frame {
    enum class Kind : uint8_t {
      kBase,
      kGroup,
      kList,
      kBrace,
      kCall,
      kSubscript,
      kParameters,
      kParameterTuple,
      kTypeParameters,
      kBases,
      kLambda,
    };
    // What a name does that nothing else is said of.
    enum class Names : uint8_t { kValues, kArguments, kParameters, kTypeParameters };
    // In what part of a comprehension (or behind an "as") the next token stands.
    enum class Part : uint8_t { kNone, kElement, kTarget, kFirstIterable, kRest };

    Kind kind = Kind::kBase;
    Names names = Names::kValues;
    Part part = Part::kNone;
    uint8_t position = 0;   // kNameDecorator or kNameBase, where names stand for such
    uint8_t flags = 0;      // the reader's, in front of it
    bool is_plain = true;   // holds nothing but one name with trailers
    bool collects = false;  // names may be targets
    bool is_comprehension = false;
    bool is_as_target = false;
    bool in_body = false;       // of a lambda
    bool is_statement = false;  // may be an assignment
    bool in_annotation = false;
    bool is_first_loop = false;  // the target is that of a comprehension's first "for"
    bool comma_is_as = false;
    bool ends_at_if = false;    // a lambda in a loop or a condition of a comprehension, in older versions
    uint32_t inner = kNoIndex;  // the scope that it opens
    uint32_t outer = 0;         // the reader's scope in front of it
    uint32_t quiet = kNoIndex;  // likewise
    uint32_t candidates = 0;    // how many there were in front of it
    uint32_t target = 0;        // how many there were in front of the target under way
  };

  // The head of a definition, while it is read.
  struct Head {
    enum class Kind : uint8_t { kNone, kFunction, kClass, kAlias };
    Kind kind = Kind::kNone;
    bool is_async = false;
    bool has_arguments = false;
    uint32_t name = kNoIndex;
    uint32_t begin = 0;
    uint32_t outer = 0;
    uint32_t type_scope = kNoIndex;
    uint32_t body = kNoIndex;
    uint32_t annotation_scope = kNoIndex;
    uint32_t parameter = kNoIndex;  // the type parameter under way
  };

  struct OpenScope {
    uint32_t scope;
    uint32_t indent;
    bool is_function;
    bool is_inline;     // its body is on its own line and ends with that
    bool awaits_first;  // no statement of the body was seen
  };

  struct EmbeddedTokens {
    std::vector<Token> tokens;
    std::vector<TokenRange> ranges;
    std::vector<size_t> hints;  // indices of the strings that are hints themselves
  };

  static constexpr int kMaxDepth = 200;  // of strings in strings
  // What a bracket of a pattern is that is no bracket alone: the arguments of a class.
  static constexpr uint8_t kClassPattern = 0;

  // ---- rows ----
  void SetMarks();
  void ReadRow(const LineRow& row);
  void Row();
  void CommentRow();
  void CloseScopes(const LineRow& row);
  void CloseScope();
  void EndOfScope(uint32_t scope, uint32_t end) { symbols_[scope].end = end; }

  // ---- statements: each leaves at_ behind what it took ----
  void Statement(LineKind kind);
  void Expression(bool is_head);  // behind the keyword at at_
  void EndColon();
  void SimpleStatement();
  void ForHead();
  void ExceptHead();
  void Decorator();
  void Delete();
  void Declaration(uint16_t use);
  void Import();
  void FromImport();
  void ImportAlias();
  void CaseHead();
  void Definition(Head::Kind kind, bool is_async);
  void AddNamespace(NameKind kind);
  void TypeAlias();
  uint32_t BodyScope();
  void EndOfHead();
  bool IsTypeAlias() const;

  // ---- expressions ----
  void BeginBase();
  void EndBase();
  // Reads to the end, or to the colon of the statement's own where it is a head.
  void ReadTokens(bool stops_at_colon);
  void Name(const Token& token);
  bool IsTemplatePrefix(const Token& token) const;
  bool SpecialName(const Token& token, uint32_t text, TokenCode next);
  void Walrus(const Token& token, uint32_t text);
  void Open(TokenCode code);
  bool OpenInHead(TokenCode code);
  void Close();
  bool Colon(bool stops);
  void Equal();
  void Assign(const Token& token);
  void Comma();
  void Lambda();
  void For();
  void In();
  void As();
  void Backquote();
  void String(const Token& token);
  void PopLambdas();
  void PopLambdaBodies();
  void PopFrame();
  void EndTarget();
  void BeginVariableAnnotation();
  void EndVariableAnnotation(bool has_value);
  void BeginHeadAnnotation();
  void OpenTypeParameterScope();

  // ---- expressions in strings and comments ----
  EmbeddedTokens& TokensOfDepth();
  void Fields(const Token& string);
  void Template(const Token& prefix);
  void HintString(const Token& string);
  void Comment(const Token& comment);
  void Hint(Text hint, uint8_t flags);
  void Embedded(TokenSpan tokens, std::span<const size_t> hints);
  bool IsPlausible(TokenSpan tokens) const;
  void FindComprehensions(TokenSpan tokens);

  // ---- occurrences ----
  uint32_t Append(const Occurrence& added) {
    out_.occurrences.push_back(added);
    return static_cast<uint32_t>(out_.occurrences.size()) - 1;
  }
  uint32_t Add(const Token& token, uint32_t text, NameRole role, NameKind kind, uint32_t flags, uint32_t symbol);
  uint32_t AddWithoutSymbol(const Token& token, uint32_t text, NameRole role);
  uint32_t AddAttribute(const Token& token, uint32_t text, NameRole role, uint32_t flags, uint32_t receiver);
  // Binds a name in a scope.
  uint32_t AddBound(const Token& token, uint32_t text, NameRole role, NameKind kind, uint16_t use, uint32_t scope);
  void Use(uint32_t symbol, uint16_t use) {
    NameSymbol& used = symbols_.symbol(symbol);
    if (used.scope != quiet_) used.uses |= use;
  }
  void MarkRead(uint32_t symbol, uint32_t text) {
    Use(symbol, NameSymbol::kRead);
    if ((texts_[text].form & TextTable::kSuper) != 0) [[unlikely]]
      MarkSuper();
  }
  void MarkSuper();
  void MakeWrites(uint32_t from, NameRole role, uint8_t flags);
  void MakeReads(uint32_t from);
  uint32_t OpenScopeAt(NameScopeKind kind, uint32_t name, const Token& token);

  // ---- tokens ----
  Mark MarkOf(const Token& token) const { return marks_[token.code]; }
  bool IsName(const Token* at) const { return at < end_ && marks_[at->code] == Mark::kName; }
  TokenCode CodeAt() const { return at_ < end_ ? at_->code : tok::ENDMARKER; }
  const Token* Next(const Token* at) const {
    do ++at;
    while (at < end_ && IsSkipCode(at->code));
    return at;
  }
  TokenCode NextCode() const {
    const Token* next = Next(at_);
    return next < end_ ? next->code : tok::ENDMARKER;
  }
  uint32_t OffsetOf(const Token& token) const { return static_cast<uint32_t>(token.text - begin_); }
  // To the next token that is no comment.
  void Step() {
    ++at_;
    SkipComments();
  }
  void SkipComments() {
    for (; at_ < end_ && IsSkipCode(at_->code); ++at_) {
      if (embeds_) Comment(*at_);
    }
  }
  uint32_t NumberOf(const Token& token) { return texts_.NumberOf(token.view()); }
  bool IsQuiet() const { return quiet_ == scope_; }

  const Version version_;
  const bool is_python2_;
  SymbolTable& symbols_;
  TextTable& texts_;
  Bindings& out_;
  std::array<Mark, 256> marks_{};

  const char* begin_ = nullptr;  // of the source
  TokenSpan tokens_;
  RowPieces pieces_;
  size_t template_budget_ = 0;  // for searches that may fail
  std::vector<OpenScope> open_;
  uint32_t last_end_ = 0;  // of the last statement
  bool has_future_annotations_ = false;

  // Of the statement.
  const Token* at_ = nullptr;
  const Token* end_ = nullptr;
  const LineRow* row_ = nullptr;
  bool embeds_ = false;  // strings and comments may hold expressions
  uint32_t statement_scope_ = 0;
  const Token* statement_begin_ = nullptr;
  uint32_t annotated_ = kNoIndex;  // the target of an annotation
  Head head_;

  // Of the expression.
  uint32_t scope_ = 0;
  uint32_t quiet_ = kNoIndex;  // the scope in which nothing counts: comments, strings, future annotations
  uint8_t flags_ = 0;
  Front front_ = Front::kOperator;
  uint32_t operand_ = kNoIndex;  // the occurrence that the value in front is
  size_t base_ = 0;              // the expression's own frame
  std::vector<Frame> frames_;
  std::vector<uint32_t> candidates_;
  std::vector<const Token*> comprehensions_;  // the brackets that hold a "for"
  size_t next_comprehension_ = 0;
  bool knows_comprehensions_ = false;  // they are looked for at the first bracket

  // Indices of the strings that are type hints, in the tokens under way.
  std::vector<size_t> row_hints_;
  std::span<const size_t> hints_;
  const Token* hints_begin_ = nullptr;
  bool in_row_ = true;

  std::deque<EmbeddedTokens> pool_;  // by depth
  int depth_ = 0;
  struct OpenBracket {
    const Token* at;
    bool holds_for;
  };
  std::vector<OpenBracket> brackets_;
  std::vector<size_t> bracket_stack_;
  std::vector<uint8_t> pattern_;  // brackets of a pattern
};

}  // namespace quillet
