// CompleteParser reads one statement of one version of Python, whole and to the letter.
//
// The tables (parser.h) know two grammars and take what they can; this parser knows every form of every
// version, and is asked about the statements that the tables reject or that are outside of what they can
// judge. It is a recursive descent over the same tokens, makes the same nodes of the same factory in the
// layouts of the newer grammar, and gives a tree that the walkers read like any other. What the version
// does not take is a ParseError whose message is in the words of the language's own newest parser and
// whose context is the index of the token at fault.
//
// Each rule leaves one node on a stack of nodes, so that whatever a failure interrupts is given back in
// one place. A failure is no exception, which costs more than many statements: the first one is kept, from then
// on the tokens are at their end to every rule, and what they would do ends by itself. A rule only has to end
// its loops at a token that it does not know, and to leave a node. A rule that matched one child makes no node of its
// own, as in the tables. Recursion is bounded: by nesting of brackets as the language bounds it, by kMaxDepth for all
// else.
#pragma once

#include <algorithm>
#include <array>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "foundations/errors.h"
#include "grammar/grammar.h"
#include "lines/logical_line.h"
#include "parser/distinct_names.h"
#include "tree/factory.h"
#include "tree/nodes.h"

namespace quillet {

// What a statement stands in, as far as that decides what it may say.
struct StatementPlace {
  enum class Scope : uint8_t { kModule, kClass, kFunction, kAsyncFunction };

  Scope scope = Scope::kModule;

  bool is_in_async() const { return scope == Scope::kAsyncFunction; }
};

class CompleteParser {
 public:
  static constexpr int kMaxBrackets = 200;
  static constexpr int kMaxDepth = 1200;

  // `grammar` is that of Python 3, whose states the factory's nodes have.
  CompleteParser(CNodeFactory& factory, const Grammar& grammar, Version version, bool print_statement);
  CompleteParser(const CompleteParser&) = delete;
  CompleteParser& operator=(const CompleteParser&) = delete;

  // The tree of a statement or of a statement's head, which is the caller's; null where there is nothing but
  // comments, and for what the version's grammar rejects, about which failure() says why.
  CNode* ParseStatement(const LogicalLine& line, StatementPlace place);
  // The same for the expression in a field of a formatted string; here and below the failure is thrown.
  CNode* ParseField(const LogicalLine& line, StatementPlace place);
  // For a hint: one expression, or several with commas between them.
  CNode* ParseHint(TokenSpan toks);
  // For a signature in a comment, `(int, *str) -> bool`: a node whose last child is the type returned and whose
  // others are those of the parameters, none for `(...)`.
  CNode* ParseSignature(TokenSpan toks);

  // Of the last statement.
  const std::optional<ParseError>& failure() const { return failure_; }

  // What the grammar took in the last statement or field and the compiler behind it does not take, such as a
  // `return` outside of a function: an error of a statement that is understood all the same.
  const std::optional<ParseError>& postponed() const { return postponed_; }

  // What the case that was read last makes of those behind it, and at which token: empty where it has a guard, or
  // does not match everything.
  const std::string& irrefutable() const { return irrefutable_words_; }
  int32_t irrefutable_at() const { return index_[irrefutable_]; }

  // Whether the last statement holds a template string.
  bool met_template() const { return met_template_; }

  CNodeFactory& factory() const { return factory_; }

 private:
  // The rules of the grammar that make nodes.
  struct Symbols {
    int and_expr, and_test, annassign, argument, arglist, arith_expr, assert_stmt, async_stmt, atom, atom_expr,
        classdef, comp_for, comp_if, comp_op, comparison, decorator, del_stmt, dictorsetmaker, dotted_as_name,
        dotted_as_names, dotted_name, except_clause, expr, expr_stmt, exprlist, factor, for_stmt, funcdef, global_stmt,
        if_stmt, import_as_name, import_as_names, import_from, import_name, lambdef, namedexpr_test, nonlocal_stmt,
        not_test, or_test, parameters, power, raise_stmt, return_stmt, shift_expr, sliceop, star_expr, subscript,
        subscriptlist, sync_comp_for, term, test, testlist_comp, testlist_star_expr, tfpdef, trailer, try_stmt,
        typedargslist, varargslist, while_stmt, with_item, with_stmt, xor_expr, yield_arg, yield_expr;
  };
  enum class TargetUse : uint8_t { kAssign, kAnnotate, kAugment, kFor, kWith, kDelete };
  // Who rejects what the grammar takes, in the order in which they are asked.
  enum Judge : uint8_t { kSymbolTable, kCompiler, kNobody };
  // An `await`, or a comprehension that holds one or is `async` itself.
  struct Wait {
    size_t at;
    bool is_comprehension;
  };
  // Of a type scope: an assignment or a yield within it.
  struct Banned {
    size_t at;
    const char* what;
  };
  class Deeper;
  class InBracket;
  // Type scopes that are told from the others.
  static constexpr char kInvalidSyntax[] = "invalid syntax";
  static constexpr char kAnnotation[] = "an annotation";
  static constexpr char kAlias[] = "a type alias";
  static constexpr char kBound[] = "a TypeVar bound";
  static constexpr char kGeneric[] = "the definition of a generic";
  static constexpr char kAsyncComprehensionOutside[] = "asynchronous comprehension outside of an asynchronous function";
  static constexpr size_t kNowhere = SIZE_MAX;
  // Of the operators, that of "|": what binds as tight may be a target.
  static constexpr int kTargetLevel = 4;

  // ---- the frame (complete_parser.cc) ----
  template <class Rule>
  CNode* Run(TokenSpan toks, StatementPlace place, Rule&& rule);
  template <class Rule>
  CNode* RunOrThrow(TokenSpan toks, StatementPlace place, Rule&& rule);
  void SetTokens(TokenSpan toks);
  // What the language's tokeniser rejects, in front of all else.
  void CheckTokens();
  void CheckNumber(const Token& token, int32_t index);
  void CheckPrefix(const Token& token, int32_t index);
  void CheckString(const Token& token, int32_t index);
  // The innermost bracket that stands open at the end, or -1.
  int32_t OpenBracket() const;
  void FailAtToken(int32_t token, std::string message);
  void FailAt(size_t at, std::string message) { FailAtToken(index_[at], std::move(message)); }
  void Fail(std::string message) { FailAt(at_, std::move(message)); }
  void FailHere() { FailGeneric(at_); }
  // "invalid syntax", or what the brackets say to that.
  void FailGeneric(size_t at);
  void FailAtNode(const CNode* node, std::string message);
  // A failure that waits for the end of the statement; the first one of the earliest judge stays.
  void Postpone(size_t at, std::string message, Judge judge = kSymbolTable);
  void PostponeAtNode(const CNode* node, std::string message, Judge judge);
  int32_t FirstTokenOf(const CNode* node) const;
  // A form that came with a later version: the statement is understood all the same.
  void RequireAt(size_t at, int minor, const char* what);
  // As if nothing had failed, or been read, since the mark; from the first token on.
  void Revive(size_t mark);
  // Reads by a rule and gives it up again; whether it could be read.
  template <class Rule>
  bool Try(Rule&& rule);
  void ExplainByBracket();
  // " on line 3" for a token that stands on another line than the one at `at`.
  std::string OnLineOf(int32_t token, size_t at) const;
  std::string DetectedAt(size_t at, bool is_triple) const;

  bool Since(int minor) const { return python3_ && minor_ >= minor; }
  TokenCode Code() const { return codes_[at_]; }
  TokenCode CodeAt(size_t ahead) const { return codes_[std::min(at_ + ahead, code_.size() - 1)]; }
  bool AtEnd() const { return Code() == tok::ENDMARKER; }
  // Of no text behind the last one.
  const Token& TokenAt(size_t at) const;
  bool IsKeyword(TokenCode code) const;
  bool IsName(TokenCode code) const { return IsNameCode(code) && !IsKeyword(code); }
  bool BeginsExpression(TokenCode code) const;
  size_t Mark() const { return nodes_.size(); }
  CNode* Top() const { return nodes_.back(); }
  void PushLeaf();
  // In the place of what a failed reading lacks.
  void PushNothing();
  // Takes a token that no tree has.
  void Skip() { at_ += !failed_; }
  void PushLeafOf(int type, const Token& token, int32_t index);
  void PushInvented(const Token& token);
  void PushName();
  bool Accept(TokenCode code);
  // `message` null: the generic one.
  void Expect(TokenCode code, const char* message);
  void ExpectEnd();
  // One node of those since the mark, for a rule with several.
  void Finish(int symbol, size_t mark);
  // The same after a failure: one node, whatever there is.
  void Collapse(size_t mark);
  // The same for a class without a state.
  template <class T>
  void FinishBare(size_t mark);

  // ---- statements (complete_statements.cc) ----
  void Statement(LineKind kind);
  template <class Rule>
  void ExplainHead(Rule&& rule);
  void SimpleStatement();
  void Suite();
  void Colon();
  bool EndsAtSemicolon() const;
  void ForcedColon();
  void IfOrWhile(int symbol);
  void Else();
  void TryClause();
  void Finally();
  void Except();
  void ExceptTypes(bool is_star);
  void For();
  void With();
  bool WithItemsInBrackets();
  void WithItem();
  bool IsAsyncStatement() const;
  void Async();
  void Definition();
  void Class();
  // How many there are; they are left on the stack.
  size_t TypeParameters();
  void TypeParameter(bool& has_default);
  void FinishWithTypeParameters(int symbol, size_t mark, size_t parameters, size_t count);
  void TypeStatement();
  // Reads by a rule what is a scope of its own in which nothing is assigned, yielded or awaited; of that name, or none.
  template <class Rule>
  void InTypeScope(const char* name, Rule&& rule);
  void JudgeTypeScope(size_t first_banned, size_t first_wait);
  const char* AnnotationScope() const;
  void Decorator();
  bool IsDottedDecorator() const;
  void ExpressionStatement();
  void Annotation(size_t mark, size_t start);
  void Delete();
  void AssertStatement();
  void Declaration(int symbol);
  void Return();
  void RaiseStatement();
  void Import();
  void ImportTarget(size_t statement);
  void FromImport();
  void DottedName();
  // `place` is where the language's compiler reports it.
  void CheckBound(size_t at, size_t place);
  void PrintStatement();
  void ExecStatement();

  // ---- parameters (complete_parameters.cc) ----
  void Parameters(bool is_lambda, TokenCode end);
  void Parameter(bool is_lambda, bool is_starred);
  void TupleParameter();
  void AddParameterName(size_t at);
  bool IsParameterStart() const;
  bool IsNamesInBrackets() const;

  // ---- expressions (complete_expressions.cc) ----
  void StarExpressions(int symbol);
  void TestOrStar();
  void NamedOrStar();
  void NamedTest();
  void FailAtAssigned();
  void FailAtEqual(size_t start, size_t mark);
  void Test();
  // Where two expressions stand side by side, the first of which is the node at `mark`: says so where that
  // explains something.
  // Where the expression that begins there ends; kNowhere where there is none.
  size_t EndOfExpression(size_t from);
  void NoteEnd() {
    if (!failed_ && brackets_ == end_level_) end_ = at_;
  }
  void CheckBetween(size_t start, size_t mark);
  void OldTest();
  void Lambda();
  void Binary(int level);
  int LevelOf(TokenCode code) const;
  void Operator(int level);
  void Factor();
  void Power();
  void AtomExpression();
  void Trailer();
  void Atom();
  void FailAtNoExpression();
  void Strings();
  void Templates();
  void Group();
  bool IsElement(size_t open, size_t close) const;
  void Elements(TokenCode close);
  void ListDisplay();
  void DictOrSet();
  void DictValue();
  void FailAtTarget(size_t start);
  void Backquotes();
  void Arguments(bool is_of_class = false);
  void FailAtTargetOf(size_t mark);
  void FailPositional(bool behind_unpacked);
  void Subscripts();
  void Subscript();
  bool IsComprehension() const;
  // What stands in front of the first "for" was read from `start` on.
  void Comprehension(const char* what, size_t start);
  void ComprehensionTail(bool is_first);
  void ComprehensionRest();
  void Yield();
  void TargetList(TargetUse use);
  void TakeWaits(size_t start);
  void JudgeWaits(size_t first);
  void CheckWalrus(size_t name);
  void CheckAssignedWithin(size_t first);
  // Those from `start` on belong to a function or to a comprehension that was read.
  void DropBanned(size_t start);
  void CheckRebound(size_t target, bool is_first);
  void AddIterated(const CNode* target);

  // ---- targets (complete_targets.cc) ----
  void CheckTarget(const CNode* node, TargetUse use, bool may_mean_equal);
  void CheckTargetNames(const CNode* node, TargetUse use);
  const CNode* InvalidTarget(const CNode* node, TargetUse use) const;
  const char* NameOfExpression(const CNode* node) const;
  bool IsBracketed(const CNode* node) const;
  // What stands in brackets that only group it.
  static const CNode* WithoutBrackets(const CNode* node);
  bool IsNameInBrackets(const CNode* node) const;
  bool IsBitwiseOr(const CNode* node) const;
  bool BeginsWithBracketedTarget(const CNode* node) const;
  // In the subscript that a chain ends with.
  void CheckSubscriptStars(const CNode* node);
  void CheckNoLoneStar(const CNode* node);
  void CheckNoStars(const CNode* node);

  // ---- patterns (complete_patterns.cc) ----
  void Match();
  void Subject();
  void Case();
  void PatternsAndGuard();
  void Patterns();
  void MaybeStarPattern();
  void AsPattern();
  void OrPattern();
  void ClosedPattern();
  void DottedValue();
  void NumberPattern();
  void ClassArguments();
  void SequencePattern(TokenCode close);
  void MappingPattern();
  void CheckCapture(size_t at);
  std::string UnreachableBehind(size_t at) const;

  CNodeFactory& factory_;
  Symbols symbols_;
  const bool python3_;
  const int minor_;
  const bool print_statement_;
  std::array<bool, 256> keyword_{};

  TokenSpan toks_;
  std::vector<int32_t> index_;        // of the significant tokens, and the token count at the end
  std::vector<TokenCode> code_;       // of the same; ENDMARKER at the end
  std::vector<TokenCode> ended_;      // as many ENDMARKERs, for what follows a failure
  const TokenCode* codes_ = nullptr;  // one of the two
  bool failed_ = false;
  std::vector<CNode*> nodes_;
  DistinctNames names_;     // of the parameters
  DistinctNames captures_;  // of a pattern
  size_t at_ = 0;
  StatementPlace place_;
  int depth_ = 0;
  int brackets_ = 0;
  const LogicalLine* line_ = nullptr;  // where it is known
  size_t furthest_ = 0;                // the last token that was looked at in a reading that was given up
  bool is_trying_ = false;             // a reading that may be given up, which explains nothing
  int end_level_ = -1;  // in how many brackets an expression stands whose end is looked for, and where it may be
  size_t end_ = kNowhere;
  bool met_template_ = false;
  bool in_field_ = false;
  const char* type_scope_ = nullptr;     // what the language calls the one around, if any
  bool in_generic_ = false;              // the head of a definition with type parameters
  bool in_iterable_ = false;             // of a comprehension
  const char* comprehension_ = nullptr;  // what the one around is called
  std::vector<size_t> assigned_;         // where names are assigned to within expressions
  std::vector<Text> iterated_;           // the names that the comprehensions around bind
  size_t yield_at_ = kNowhere;           // the last yield that was read
  std::vector<Wait> waits_;              // that no comprehension took yet
  std::vector<Banned> banned_;           // what would be wrong if the type scope around held it itself
  bool has_async_for_ = false;           // the comprehension around
  size_t first_iterable_begin_ = 0;      // of the comprehension around
  size_t first_iterable_end_ = 0;
  size_t irrefutable_ = kNowhere;  // the name in the pattern that was read last that matches everything
  std::string irrefutable_words_;
  std::optional<ParseError> failure_;
  std::optional<ParseError> postponed_;
  Judge judge_ = kNobody;
};

}  // namespace quillet
