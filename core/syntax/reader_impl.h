// The reader of SyntaxReader: recursive descent over the tokens of a row, between two tokens that are none.
//
// A row is copied without its comments, so that the next token is the next one in memory and what stands
// behind the last one ends every list. Whatever opens a level (a bracket, a lambda, a string in a string)
// counts in depth_, and is skipped where that is at its limit; chains of operators, of trailers and of
// conditionals are loops. Children are collected on a stack and copied behind each other when their parent
// is done. What is missing or left over is counted in faults_, which says of a part whether it is broken.
#pragma once

#include <array>
#include <deque>
#include <initializer_list>
#include <span>
#include <vector>

#include "lines/fstring_fields.h"
#include "lines/row_pieces.h"
#include "lines/token_search.h"
#include "syntax/reader.h"

namespace quillet {

class SyntaxReader::Impl {
 public:
  explicit Impl(Version version);

  void Read(const SourceText& source, std::span<const LineRow> rows, FileSyntax& out);

 private:
  static constexpr int kMaxDepth = 200;
  static constexpr size_t kMaxBlocks = 200;

  // How tightly an operator binds; 0 is none.
  enum Binding : uint8_t {
    kNoBinding,
    kOrBinding,
    kAndBinding,
    kNotBinding,
    kCompareBinding,
    kBitOrBinding,
    kBitXorBinding,
    kBitAndBinding,
    kShiftBinding,
    kSumBinding,
    kProductBinding,
    kSignBinding,
    kPowerBinding,
    kAwaitBinding,
  };

  // What a token is to the reader; bits, by code.
  enum Mark : uint8_t {
    kIsIdentifier = 1,
    kBeginsOperand = 2,  // it, or an operator in front of one
    kIsPrefix = 4,
    kIsSkipped = 8,
    kEndsHead = 16,  // a word that begins a statement
  };

  struct Block {
    StmtId stmt;
    uint32_t indent;
    bool is_inline;   // it is on its head's own line and ends with that
    StmtId last;      // child
    StmtId function;  // that its statements run in; kModuleStmt for none
  };

  struct Comment {
    size_t index;  // of the token that follows it
    Token token;
  };

  struct Operation {
    TokenCode code;
    uint8_t binding;
    uint8_t op;
    bool is_prefix;
    uint32_t operands;  // of a comparison
    uint32_t begin;     // of a prefix
  };
  struct Operand {
    ExprId expr;
    uint32_t begin;  // its own brackets included
  };
  struct Condition {
    ExprId value;
    ExprId condition;
    uint32_t begin;
  };

  // The tokens of an expression in a string or a comment.
  struct EmbeddedTokens {
    std::vector<Token> tokens;
    std::vector<TokenRange> ranges;
    std::vector<size_t> hints;  // indices of the strings that are hints themselves
    std::vector<Token> framed;
  };

  // Where the reader stands in a list of tokens.
  struct Place {
    Token* begin = nullptr;  // the first one, behind the one that is none
    Token* at = nullptr;
    Token* end = nullptr;               // the one behind the last
    std::span<const size_t> hints;      // those still to come
    std::array<uint32_t, 3> open = {};  // brackets of each sort around it
  };

  // Inside of a bracket, a lambda and whatever else may hold itself.
  class Level {
   public:
    explicit Level(Impl& reader) : reader_(reader), takes_conditionals_(reader.takes_conditionals_) {
      ++reader_.depth_;
      reader_.takes_conditionals_ = true;
    }
    // Behind an opening bracket, which it takes.
    Level(Impl& reader, TokenCode bracket) : Level(reader) {
      open_ = &reader.OpenOf(bracket);
      ++*open_;
      reader.Step();
    }
    ~Level() {
      --reader_.depth_;
      reader_.takes_conditionals_ = takes_conditionals_;
      if (open_ != nullptr) --*open_;
    }
    Level(const Level&) = delete;
    Level& operator=(const Level&) = delete;

   private:
    Impl& reader_;
    const bool takes_conditionals_;
    uint32_t* open_ = nullptr;
  };

  // What was there at some point, to go back to.
  struct Extent {
    size_t exprs;
    size_t lists;
    size_t named;
    size_t scratch;
    uint32_t faults;
  };

  // ---- rows and blocks (reader.cc) ----
  void SetMarks();
  void ReadRow(const LineRow& row);
  void SignatureRow(const LineRow& row);
  void Load(TokenSpan tokens, std::vector<Token>& framed);
  void CloseBlocks(const LineRow& row);
  void CloseBlock();
  void OpenBlock(StmtId stmt);
  StmtId BeginStatement(StmtKind kind, uint32_t begin);
  void SetExprs(StmtId stmt, size_t mark);
  void FinishStatement(StmtId stmt, size_t mark);

  // ---- statements (read_statements.cc) ----
  void Statement(LineKind kind);
  void SimpleStatement();
  void Broken(bool is_head);
  void EndOfHead(StmtId stmt, size_t mark);
  void ConditionHead(StmtKind kind, bool has_condition);
  void ForHead(uint32_t begin, bool is_async);
  void ExceptHead();
  void WithHead(uint32_t begin, bool is_async);
  bool AreWithItems();
  void WithItem();
  void MatchHead();
  void CaseHead();
  void Keyword(StmtKind kind);
  void Return();
  void Raise();
  void Assert();
  void Delete();
  void Print();
  void Exec();
  void Declaration(StmtKind kind);
  void Import();
  void FromImport();
  ExprId ModulePath();
  void Decorator();
  void FlushDecorators();
  void Definition(StmtKind kind, uint32_t begin, bool is_async);
  void TypeAlias();
  void TypeParameters();
  void Parameter(bool is_lambda);
  void EndOfParameters(const Token* end);
  bool IsTypeAlias() const;
  bool IsPrintStatement() const;
  bool IsExecStatement() const;
  bool BeginsStatement() const;

  // ---- expressions (read_expressions.cc) ----
  // One, or a tuple of those that commas part, as they stand without brackets.
  ExprId OneOrTuple(ExprId (Impl::*read)());
  ExprId Expressions() { return OneOrTuple(&Impl::StarExpression); }
  ExprId StarExpression();
  ExprId Expression();
  // Without a conditional and ":=": operators that bind at least so tightly.
  ExprId Operators(uint8_t least);
  ExprId Conditional(ExprId value, uint32_t begin);
  ExprId Targets() { return OneOrTuple(&Impl::Target); }
  ExprId Target();
  ExprId Primary();
  ExprId Atom();
  ExprId Trailers(ExprId value, uint32_t begin);
  ExprId Call(ExprId function, uint32_t begin);
  ExprId Subscript(ExprId value, uint32_t begin);
  ExprId Attribute(ExprId value, uint32_t begin);
  void SubscriptItem();
  bool Arguments();
  void Argument();
  ExprId Group();
  ExprId List();
  ExprId Brace();
  ExprId Backquote();
  ExprId Lambda();
  ExprId Yield();
  ExprId Generator(ExprId element, uint32_t begin);
  ExprId Name();
  ExprId Number();
  ExprId Constant(ConstantValue value);
  // Nothing is there, behind the last token.
  ExprId Missing() { return MissingAt(LastEnd()); }
  ExprId MissingAt(uint32_t place);
  ExprId SkipBracket();
  bool IsClause() const;
  void Clauses(bool takes_commas = false);
  void Clause(bool takes_commas);
  void MarkTarget(ExprId target);
  bool IsAwait() const;
  bool IsPrefix() const;
  bool TakeOperation(uint8_t least, size_t base);
  void Reduce();
  // Reads items up to the bracket that closes them and behind it; false where that is not there.
  template <class Item>
  bool Items(TokenCode close, TokenCode also_begins, Item item, bool* ends_with_comma = nullptr);

  // ---- patterns (read_patterns.cc) ----
  ExprId Patterns();
  ExprId Pattern();
  ExprId OrPattern();
  ExprId ClosedPattern();
  ExprId NamePattern();
  ExprId StarPattern(uint32_t begin);
  ExprId BracketPattern(TokenCode close);
  ExprId MappingPattern();
  void ClassArgument();

  // ---- strings and comments (read_embedded.cc) ----
  ExprId String();
  bool IsTemplatePrefix(const Token& token) const;
  void JoinTemplate();
  void Fields(const Token& string);
  ExprId HintOf(const Token& string);
  ExprId CommentHint(const Token& comment);
  void TakeComments(StmtId stmt);
  ExprId Embedded(TokenSpan tokens, EmbeddedTokens& embedded, bool is_hint);
  ExprId Hint(Text text);
  ExprId Signature();
  EmbeddedTokens& TokensOfDepth();

  // ---- nodes ----
  ExprId Add(ExprKind kind, uint32_t begin, uint32_t end, uint8_t op = 0) {
    const auto id = static_cast<ExprId>(out_->exprs.size());
    Expr& added = out_->exprs.emplace_back();
    added.kind = kind;
    added.op = op;
    added.begin = begin;
    added.end = end;
    return id;
  }
  void SetName(ExprId expr, const Token& name) {
    out_->exprs[expr].name_begin = OffsetOf(name);
    out_->exprs[expr].name_end = OffsetOf(name) + name.length;
    out_->named.push_back(expr);
  }
  void SetNoName(ExprId expr) { out_->exprs[expr].name_begin = out_->exprs[expr].name_end = LastEnd(); }
  void SetChildren(ExprId expr, std::span<const ExprId> children) {
    Expr& parent = out_->exprs[expr];
    parent.children_begin = static_cast<uint32_t>(out_->lists.size());
    parent.children_count = static_cast<uint32_t>(children.size());
    out_->lists.insert(out_->lists.end(), children.begin(), children.end());
    for (const ExprId id : children) {
      if (id == kNoExpr) continue;
      Expr& child = out_->exprs[id];
      child.parent = expr;
      // What is missing stands behind the token in front, where its parent begins with it.
      if (child.begin < parent.begin) [[unlikely]]
        parent.begin = child.begin;
    }
  }
  void SetChildren(ExprId expr, std::initializer_list<ExprId> children) {
    SetChildren(expr, std::span(children.begin(), children.size()));
  }
  // Children that may be absent; the last of them that are get no place.
  void SetParts(ExprId expr, std::initializer_list<ExprId> parts) {
    size_t count = parts.size();
    while (count > 0 && parts.begin()[count - 1] == kNoExpr) --count;
    if (count > 0) SetChildren(expr, std::span(parts.begin(), count));
  }
  // Those on the stack behind `mark`.
  void TakeChildren(ExprId expr, size_t mark) {
    SetChildren(expr, std::span(scratch_).subspan(mark));
    scratch_.resize(mark);
  }
  // An expression that ends with the last token.
  ExprId Node(ExprKind kind, uint32_t begin, std::initializer_list<ExprId> children, uint8_t op = 0) {
    const ExprId id = Add(kind, begin, LastEnd(), op);
    SetChildren(id, children);
    return id;
  }
  ExprId NodeOf(ExprKind kind, uint32_t begin, size_t mark, uint8_t op = 0) {
    const ExprId id = Add(kind, begin, LastEnd(), op);
    TakeChildren(id, mark);
    return id;
  }
  void Fault() { ++faults_; }
  void Break(ExprId expr) {
    out_->exprs[expr].flags |= kIsBroken;
    ++faults_;
  }
  void Flag(ExprId expr, ExprFlag flag) { out_->exprs[expr].flags |= flag; }
  void EndHere(ExprId expr) { out_->exprs[expr].end = LastEnd(); }
  void Push(ExprId expr) { scratch_.push_back(expr); }

  Extent Now() const { return {out_->exprs.size(), out_->lists.size(), out_->named.size(), scratch_.size(), faults_}; }
  void GoBack(const Extent& extent);

  // ---- tokens ----
  TokenCode Code() const { return place_.at->code; }
  TokenCode NextCode() const { return AtEnd() ? tok::ENDMARKER : place_.at[1].code; }
  bool Is(TokenCode code) const { return place_.at->code == code; }
  bool AtEnd() const { return place_.at->code == tok::ENDMARKER; }
  void Step() { ++place_.at; }
  bool Take(TokenCode code) {
    if (!Is(code)) return false;
    Step();
    return true;
  }
  uint8_t MarksOf(TokenCode code) const { return marks_[code]; }
  bool IsName() const { return (marks_[Code()] & kIsIdentifier) != 0; }
  bool BeginsExpression() const { return (marks_[Code()] & kBeginsOperand) != 0; }
  bool IsArrow() const { return Is(tok::RARROW) && *place_.at->text == '-'; }
  uint32_t OffsetOf(const Token& token) const { return static_cast<uint32_t>(token.text - begin_); }
  uint32_t Begin() const { return OffsetOf(*place_.at); }
  uint32_t LastEnd() const { return OffsetOf(place_.at[-1]) + place_.at[-1].length; }
  size_t Index() const { return static_cast<size_t>(place_.at - place_.begin); }
  uint32_t& OpenOf(TokenCode bracket) {
    const bool is_round = bracket == tok::LPAR || bracket == tok::RPAR;
    return place_.open[is_round ? 0 : bracket == tok::LSQB || bracket == tok::RSQB ? 1 : 2];
  }
  bool TooDeep() const { return depth_ >= kMaxDepth; }

  const Version version_;
  const bool is_python2_;
  std::array<uint8_t, 256> marks_{};
  std::array<uint8_t, 256> bindings_{};  // of what stands between two operands

  const char* begin_ = nullptr;  // of the source
  TokenSpan tokens_;
  RowPieces pieces_;
  FileSyntax* out_ = nullptr;
  bool has_print_statement_ = false;
  size_t search_budget_ = 0;  // for searches that may be in vain
  std::vector<Block> blocks_;
  std::vector<ExprId> decorators_;  // in front of their definition
  uint32_t decorators_begin_ = 0;

  // Of the row.
  const LineRow* row_ = nullptr;
  bool embeds_ = false;  // strings and comments may hold expressions
  std::vector<Token> row_tokens_;
  std::vector<size_t> row_hints_;
  std::vector<Comment> comments_;
  size_t next_comment_ = 0;
  ExprId last_parameter_ = kNoExpr;

  Place place_;
  int depth_ = 0;
  bool takes_conditionals_ = true;  // not in the loops and conditions of a comprehension
  uint32_t lambdas_ = 0;            // around
  uint32_t faults_ = 0;
  uint32_t faults_before_ = 0;  // the statement
  std::vector<ExprId> scratch_;
  std::vector<Operation> operations_;
  std::vector<Operand> operands_;
  std::vector<Condition> conditions_;

  std::deque<EmbeddedTokens> pool_;
  size_t pool_depth_ = 0;
};

template <class Item>
bool SyntaxReader::Impl::Items(TokenCode close, TokenCode also_begins, Item item, bool* ends_with_comma) {
  bool has_comma = true;
  for (;;) {
    const TokenCode code = Code();
    if (code == close) {
      Step();
      return true;
    }
    if (code == tok::ENDMARKER) return false;
    if ((marks_[code] & kBeginsOperand) != 0 || code == also_begins) {
      if (!has_comma) Fault();
      item();
      has_comma = Take(tok::COMMA);
      if (ends_with_comma != nullptr) *ends_with_comma = has_comma;
      continue;
    }
    Fault();
    if (IsClosingBracket(code) && OpenOf(code) > 0) return false;
    has_comma = code == tok::COMMA;
    Step();
  }
}

}  // namespace quillet
