// FileSyntax: the statements and expressions of a file, as two lists of small structs.
//
// It is what questions about meaning walk: which value a name is given, what a call calls, what encloses a
// place. It is read from tokens and never fails: what no grammar takes leaves kMissing, kBroken, or an
// attribute without a name, in the middle of what is there, because the place that is asked about is mostly
// one that is just being typed. All versions of the language are read alike, wherever their meanings agree.
//
// Nodes are numbers. Expression 0 is the absent one, statement 0 the module. Offsets are bytes of the
// source, so that a name finds its occurrence in Bindings by where it begins.
//
// Brackets nest to a depth of 200, in which the rest of a bracket is kMissing. So do blocks; what stands in a deeper
// one is of the last that counts, behind its head. What chains has no limit
// (`a.b.c...`, `a + b + c...`, `not not...`): who goes down such a tree goes in a loop, or counts.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "foundations/text.h"
#include "tokens/token.h"

namespace quillet {

using ExprId = uint32_t;
using StmtId = uint32_t;
inline constexpr ExprId kNoExpr = 0;
inline constexpr StmtId kModuleStmt = 0;

// Behind each kind its children, in order; those in brackets may be kNoExpr. "name" is Expr::name_begin..name_end.
enum class ExprKind : uint8_t {
  kMissing,            // nothing stands where an expression has to, behind the token in front (empty), or too deep
  kName,               // name
  kNumber,             // op: NumberType
  kString,             // op: bits of StringBits; the values of its replacement fields, or the hint that it holds
  kConstant,           // op: ConstantValue; name, in Python 2, where the words are names
  kAttribute,          // name (empty for `x.`); value
  kSubscript,          // value, items...
  kSlice,              // [lower], [upper], [step]
  kCall,               // function, arguments...
  kKeyword,            // name; value
  kStarred,            // value
  kDoubleStarred,      // value
  kTuple,              // items...
  kList,               // items...
  kSet,                // items...
  kDict,               // key, value, key, value, ...; for `**x`: kDoubleStarred, kNoExpr
  kUnary,              // op: token or word code; operand
  kBinary,             // op: token code; left, right
  kBoolean,            // op: word::kAnd or word::kOr; left, right
  kCompare,            // op: CompareOperator of the first; operands...
  kConditional,        // value, condition, otherwise
  kLambda,             // parameters..., body
  kParameter,          // op: ParameterKind; name; [annotation], [default], [the tuple of a Python 2 parameter];
                       // the annotation may be a comment behind it
  kListComprehension,  // element, clauses...
  kSetComprehension,   // element, clauses...
  kDictComprehension,  // key, value, clauses...
  kGenerator,          // element, clauses...
  kComprehensionFor,   // target, iterable, conditions...
  kAwait,              // value
  kYield,              // [value]
  kYieldFrom,          // value
  kNamed,              // `:=`: kName, value
  kBackquote,          // value
  kModulePath,         // op: leading dots (at most 255); kName for each part, kMissing behind a last dot
  kImportAlias,        // of `import`: kModulePath, [kName behind `as`]; of `from`: kName, [kName]; `*`: kIsStar, none
  kWithItem,           // value, [target]
  kPatternCapture,     // name (empty for `_`)
  kPatternStar,        // name (empty for `*_`)
  kPatternValue,       // value
  kPatternClass,       // class, patterns..., kKeyword with a pattern...
  kPatternSequence,    // patterns...
  kPatternMapping,     // key, pattern, ...; for `**rest`: kPatternStar, kNoExpr
  kPatternOr,          // patterns...
  kPatternAs,          // pattern, kName
  kTypeParameter,      // op: ParameterKind (kPlain, kStar, kDoubleStar); name; [bound], [default]
  kSignatureHint,      // the comment `# type: (int, str) -> bool`: parameters' hints..., result
};

enum class NumberType : uint8_t { kInt, kLong, kFloat, kComplex };
enum StringBits : uint8_t {
  kStringBytes = 1,
  kStringUnicode = 2,
  kStringFormatted = 4,
  kStringTemplate = 8,
  kStringRaw = 16
};
enum class ConstantValue : uint8_t { kNone, kTrue, kFalse, kEllipsis };
enum class ParameterKind : uint8_t { kPlain, kStar, kDoubleStar, kBareStar, kSlash };
enum class CompareOperator : uint8_t {
  kEqual,
  kNotEqual,
  kLess,
  kGreater,
  kLessEqual,
  kGreaterEqual,
  kIs,
  kIsNot,
  kIn,
  kNotIn
};

enum ExprFlag : uint16_t {
  kParenthesized = 1,  // stands in round brackets of its own
  kTrailingComma = 2,  // of a tuple or of the items of a subscript
  kIsStar = 4,         // of kImportAlias
  kAsyncClause = 8,    // of kComprehensionFor
  kHoldsHint = 16,     // of kString: it stands where a hint is expected, and its child is what it says
  kIsTarget = 32,      // a name, attribute or subscript that is assigned (in any way, also augmented and deleted)
  kIsBroken = 64,      // tokens are missing or left over in it (an unclosed bracket, `f(a b)`)
};

struct Expr {
  ExprKind kind = ExprKind::kMissing;
  uint8_t op = 0;
  uint16_t flags = 0;
  uint32_t begin = 0;
  uint32_t end = 0;
  uint32_t name_begin = 0;
  uint32_t name_end = 0;
  uint32_t children_begin = 0;
  uint32_t children_count = 0;
  ExprId parent = kNoExpr;  // kNoExpr for an expression of a statement
};
static_assert(sizeof(Expr) == 32);

// Behind each kind its expressions, in order.
enum class StmtKind : uint8_t {
  kModule,
  kExpression,       // value
  kAssign,           // targets..., value
  kAugmentedAssign,  // op: token code of the operator (`+=`); target, value
  kAnnotated,        // target, [value]; hint: the annotation
  kReturn,           // [value]
  kDelete,           // targets...
  kRaise,            // expressions...
  kAssert,           // condition, [message]
  kImport,           // kImportAlias...
  kFromImport,       // kModulePath, kImportAlias...
  kGlobal,           // kName...
  kNonlocal,         // kName...
  kTypeAlias,        // name; type parameters..., value
  kPrint,            // values..., a file behind `>>` among them (Python 2)
  kExec,             // values... (Python 2)
  kPass,             // also break and continue: op is the word's code
  kFor,              // target, iterable
  kWhile,            // condition
  kIf,               // condition
  kElif,             // condition
  kElse,             // of if, for, while and try
  kTry,
  kExcept,  // [type], [kName, or a target in Python 2]; flags: kExceptGroup
  kFinally,
  kWith,    // kWithItem...
  kMatch,   // subject
  kCase,    // pattern, [guard]
  kDef,     // name; decorators..., type parameters..., parameters...; hint: the result's annotation
  kClass,   // name; decorators..., type parameters..., arguments as of a call...
  kBroken,  // what could be read of it...: what is left over of the statement in front, or of the head that it is
            // the first of the block of; decorators without a definition
};

enum StmtFlag : uint16_t {
  kAsyncStmt = 1,
  kExceptGroup = 2,
  kHasYield = 4,         // of kDef: it is a generator
  kHintIsComment = 8,    // Stmt::hint is a type comment
  kStmtIsBroken = 16,    // tokens are missing or left over
  kHasReturnValue = 32,  // of kDef: a return statement of its own gives a value
};

struct Stmt {
  StmtKind kind = StmtKind::kModule;
  uint8_t op = 0;
  uint16_t flags = 0;
  uint32_t begin = 0;                // of a decorated one the word `def`, `async` or `class`
  uint32_t end = 0;                  // of the statement or head
  uint32_t block_end = 0;            // behind the last statement of its block; `end` without a block
  StmtId parent = kModuleStmt;       // whose block it stands in
  StmtId first_child = kModuleStmt;  // of its block; kModuleStmt without one
  StmtId next = kModuleStmt;         // of the same block
  StmtId previous = kModuleStmt;
  uint32_t exprs_begin = 0;
  uint32_t exprs_count = 0;
  ExprId hint = kNoExpr;  // annotation, type comment, or (of kDef without annotations) kSignatureHint
  uint32_t name_begin = 0;
  uint32_t name_end = 0;
  uint16_t decorator_count = 0;
  uint16_t type_parameter_count = 0;
};

struct FileSyntax {
  std::vector<Expr> exprs;
  std::vector<Stmt> stmts;
  std::vector<ExprId> lists;  // children of expressions and expressions of statements
  std::vector<ExprId> named;  // the expressions with a name that is not empty, in order of their names
  const char* source = nullptr;
  bool has_lambdas = false;

  const Expr& operator[](ExprId expr) const { return exprs[expr]; }
  const Stmt& stmt(StmtId stmt) const { return stmts[stmt]; }

  std::span<const ExprId> ChildrenOf(ExprId expr) const { return ChildrenOf(exprs[expr]); }
  std::span<const ExprId> ChildrenOf(const Expr& expr) const {
    return std::span(lists).subspan(expr.children_begin, expr.children_count);
  }
  // kNoExpr where there are fewer.
  ExprId ChildOf(ExprId expr, size_t i) const {
    return i < exprs[expr].children_count ? lists[exprs[expr].children_begin + i] : kNoExpr;
  }
  // All of a statement; of a definition or class those of one sort.
  std::span<const ExprId> ExprsOf(const Stmt& stmt) const {
    return std::span(lists).subspan(stmt.exprs_begin, stmt.exprs_count);
  }
  std::span<const ExprId> DecoratorsOf(const Stmt& stmt) const { return ExprsOf(stmt).first(stmt.decorator_count); }
  std::span<const ExprId> TypeParametersOf(const Stmt& stmt) const {
    return ExprsOf(stmt).subspan(stmt.decorator_count, stmt.type_parameter_count);
  }
  // Parameters of a definition, arguments of a class, the value of a type alias.
  std::span<const ExprId> ArgumentsOf(const Stmt& stmt) const {
    return ExprsOf(stmt).subspan(size_t{stmt.decorator_count} + stmt.type_parameter_count);
  }

  Text TextOf(const Expr& expr) const { return {source + expr.begin, expr.end - expr.begin}; }
  Text NameOf(const Expr& expr) const { return {source + expr.name_begin, expr.name_end - expr.name_begin}; }
  Text NameOf(const Stmt& stmt) const { return {source + stmt.name_begin, stmt.name_end - stmt.name_begin}; }
  Text NameOf(ExprId expr) const { return NameOf(exprs[expr]); }
  // The names of a kModulePath with dots between them, all or the first `parts` of them.
  std::string DottedNameOf(ExprId path, size_t parts = SIZE_MAX) const;

  // The innermost statement in whose extent (its block included, decorators too) a place lies, kModuleStmt
  // without one; logarithmic.
  StmtId StatementAt(uint32_t offset) const;
  // The innermost expression of that statement that holds the place; one that ends there counts where none
  // begins there. kNoExpr without one.
  ExprId ExpressionAt(uint32_t offset) const;
  // The expression kName, kAttribute, kKeyword, kParameter, kImportAlias... whose name begins at an offset (where an
  // occurrence of Bindings stands); kNoExpr for the names of statements (StatementNamedAt) and for what was not read.
  ExprId NamedAt(uint32_t offset) const;
  // The `def` or `class` whose name begins there; kModuleStmt without one.
  StmtId StatementNamedAt(uint32_t offset) const;
  // The statement whose expression this is.
  StmtId StatementOf(ExprId expr) const;

  size_t ByteSize() const;
  void Clear();

 private:
  // The last statement that begins at a place or in front of it, decorators included.
  StmtId LastBegunAt(uint32_t offset) const;
  ExprId HoldingAt(std::span<const ExprId> list, uint32_t offset) const;
  ExprId InnermostAt(ExprId expr, uint32_t offset) const;  // of one that holds it
};

// The words of the kinds, without their "k".
Text WordOf(ExprKind kind);
Text WordOf(StmtKind kind);

}  // namespace quillet
