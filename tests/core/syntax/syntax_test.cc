// What the reader says of statements and expressions, whole ones and broken ones, and where it finds them.
#include <gtest/gtest.h>

#include <algorithm>
#include <utility>

#include "tests/core/support/syntax_text.h"

namespace quillet {
namespace {

using testing::ReadSource;
using testing::SyntaxText;

constexpr Version kPython2 = Version::Of(2, 7);

// ---- expressions ----

TEST(Syntax, OperatorsBind) {
  EXPECT_EQ(SyntaxText("a + b * -c ** -d - e\n"),
            "Expression (Binary#15 (Binary#14 a (Binary#16 b (Unary#15 (Binary#36 c (Unary#15 d))))) e)\n");
  EXPECT_EQ(SyntaxText("a ** b ** c\n"), "Expression (Binary#36 a (Binary#36 b c))\n");
  EXPECT_EQ(SyntaxText("a < b + c is not d not in e\n"), "Expression (Compare#2 a (Binary#14 b c) d e)\n");
  EXPECT_EQ(SyntaxText("a is not b\n"), "Expression (Compare#7 a b)\n");
  EXPECT_EQ(SyntaxText("a not in b\n"), "Expression (Compare#9 a b)\n");
  const std::string is_not = "Unary#" + std::to_string(word::kNot), is_or = "Boolean#" + std::to_string(word::kOr),
                    is_and = "Boolean#" + std::to_string(word::kAnd);
  EXPECT_EQ(SyntaxText("not a == b\n"), "Expression (" + is_not + " (Compare a b))\n");
  EXPECT_EQ(SyntaxText("a or b and not c or d\n"),
            "Expression (" + is_or + " (" + is_or + " a (" + is_and + " b (" + is_not + " c))) d)\n");
  EXPECT_EQ(SyntaxText("a | b ^ c & d << e\n"),
            "Expression (Binary#18 a (Binary#33 b (Binary#19 c (Binary#34 d e))))\n");
  EXPECT_EQ(SyntaxText("await a ** b\n"), "Expression (Binary#36 (Await a) b)\n");
  EXPECT_EQ(SyntaxText("await (a)\n", Version::Of(3, 4)), "Expression (Call await a)\n");
}

TEST(Syntax, ConditionalsAndLambdas) {
  EXPECT_EQ(SyntaxText("a if b else c if d else e\n"), "Expression (Conditional a b (Conditional c d e))\n");
  EXPECT_EQ(SyntaxText("lambda x, *y, z=1, **k: x if y else z\n"),
            "Expression (Lambda (Parameter 'x') (Parameter#1 'y') (Parameter 'z' - 1) (Parameter#2 'k') "
            "(Conditional x y z))\n");
  EXPECT_EQ(SyntaxText("lambda a, /, b, *, c: 0\n"),
            "Expression (Lambda (Parameter 'a') (Parameter#4) (Parameter 'b') (Parameter#3) (Parameter 'c') 0)\n");
  EXPECT_EQ(SyntaxText("[x for x in y if a if lambda: b if c]\n"),
            "Expression (ListComprehension x (ComprehensionFor x= y a (Lambda b) c))\n");
  EXPECT_EQ(SyntaxText("(a := b, c)\n"), "Expression (Tuple (Named a= b) c)()\n");
}

TEST(Syntax, TrailersAndArguments) {
  EXPECT_EQ(SyntaxText("f(a, *b, c=d, **e).g[1:2, ::3, ...][x,]\n"),
            "Expression (Subscript (Subscript (Attribute 'g' (Call f a (Starred b) (Keyword 'c' d) (DoubleStarred e))) "
            "(Slice 1 2 -) (Slice - - 3) ...) x),\n");
  EXPECT_EQ(SyntaxText("f(x for x in y)\n"), "Expression (Call f (Generator x (ComprehensionFor x= y)))\n");
  EXPECT_EQ(SyntaxText("f((yield), print=1)\n"), "Expression (Call f (Yield)() (Keyword 'print' 1))\n");
}

TEST(Syntax, Displays) {
  EXPECT_EQ(SyntaxText("(), (a), (a,), (a, b)\n"), "Expression (Tuple (Tuple)() a() (Tuple a)(), (Tuple a b)())\n");
  EXPECT_EQ(
      SyntaxText("[], [a, *b], {}, {a, *b}, {a: b, **c}\n"),
      "Expression (Tuple (List) (List a (Starred b)) (Dict) (Set a (Starred b)) (Dict a b (DoubleStarred c) -))\n");
  EXPECT_EQ(SyntaxText("{a for a in b}, {a: b for a, b in c async for d in e}\n"),
            "Expression (Tuple (SetComprehension a (ComprehensionFor a= b)) (DictComprehension a b (ComprehensionFor "
            "(Tuple a= b=) c) (ComprehensionFor d= e)~))\n");
  EXPECT_EQ(SyntaxText("1, 0xE, 1e5, 1., 2j, 3L, 0x1FL, None, True, ...\n"),
            "Expression (Tuple 1 0xE 1e5 1. 2j 3L 0x1FL None True ...)\n");
}

TEST(Syntax, NumbersHaveATypeAndStringsLetters) {
  const ReadSource read("1, 0xE, 1e5, 1., 2j, 3L, 0x1FL, b'', ur'', f'', t''");
  std::string ops;
  for (const ExprId item : read.file.ChildrenOf(read.file.ExprsOf(read.file.stmt(1))[0]))
    ops += std::to_string(read.file[item].op) + " ";
  EXPECT_EQ(ops, "0 0 2 2 3 1 1 1 18 4 8 ");
}

TEST(Syntax, FieldsOfStrings) {
  EXPECT_EQ(SyntaxText("f'{a!r:{b}} {c, d}' 'x' rf\"{e=}\"\n"), "Expression (String#20 a b (Tuple c d) e)\n");
  EXPECT_EQ(SyntaxText("t'{a[\"x\"]} {b}'.c\n"), "Expression (Attribute 'c' (String#8 (Subscript a \"x\") b))\n");
  EXPECT_EQ(SyntaxText("f'{a.}'\n"), "Expression! (String#4 (Attribute a)!)\n");
}

// ---- statements ----

TEST(Syntax, Assignments) {
  EXPECT_EQ(SyntaxText("a = b.c, [d, *e[0]] = f\n"),
            "Assign a= (Tuple (Attribute 'c' b)= (List d= (Starred (Subscript e 0)=))) f\n");
  EXPECT_EQ(SyntaxText("a += yield\n"), "AugmentedAssign a= (Yield)\n");
  EXPECT_EQ(SyntaxText("a: int\nb: List['C'] = d\n"),
            "Annotated a= : int\nAnnotated b= d : (Subscript List (String C):)\n");
}

TEST(Syntax, SimpleStatements) {
  EXPECT_EQ(SyntaxText("pass; break; return; raise\n"), "Pass\nPass\nReturn\nRaise\n");
  EXPECT_EQ(SyntaxText("del a, (b, c), d[0]\n"), "Delete a= (Tuple b= c=)() (Subscript d 0)=\n");
  EXPECT_EQ(SyntaxText("assert a, b\nraise a from b\nglobal a, b\nnonlocal c\n"),
            "Assert a b\nRaise a b\nGlobal a b\nNonlocal c\n");
  EXPECT_EQ(SyntaxText("import a.b as c, d\nfrom ...e import (f, g as h,)\nfrom . import *\n"),
            "Import (ImportAlias (ModulePath a b) c) (ImportAlias (ModulePath d))\n"
            "FromImport (ModulePath#3 e) (ImportAlias f) (ImportAlias g h)\n"
            "FromImport (ModulePath#1) (ImportAlias)*\n");
}

TEST(Syntax, StatementsOfPython2) {
  EXPECT_EQ(SyntaxText("print >>f, a, b,\nprint\nprint (a), b\n", kPython2), "Print f a b\nPrint\nPrint a() b\n");
  EXPECT_EQ(SyntaxText("from __future__ import print_function\nprint(a)\n", kPython2),
            "FromImport (ModulePath __future__) (ImportAlias print_function)\nExpression (Call print a)\n");
  EXPECT_EQ(SyntaxText("exec a in b, c\nexec(a)\nraise A, b, c\nx = `a, b`\n", kPython2),
            "Exec a b c\nExec a()\nRaise A b c\nAssign x= (Backquote (Tuple a b))\n");
  EXPECT_EQ(SyntaxText("try: pass\nexcept A, e: pass\nexcept (A, B), e.x: pass\n", kPython2),
            "Try\n  Pass\nExcept A e=\n  Pass\nExcept (Tuple A B)() (Attribute 'x' e)=\n  Pass\n");
  EXPECT_EQ(SyntaxText("def f(a, (b, (c,))=1): pass\n[x for x in 1, 2]\n", kPython2),
            "Def 'f' (Parameter 'a') (Parameter - 1 (Tuple b= (Tuple c=)(),)())\n  Pass\n"
            "Expression (ListComprehension x (ComprehensionFor x= (Tuple 1 2)))\n");
  // Also where it was meant for a newer one.
  EXPECT_EQ(SyntaxText("print 'a', b\nexec 'a'\n"), "Print 'a' b\nExec 'a'\n");
  EXPECT_EQ(SyntaxText("except A, e: pass\n", Version::Of(3, 13)), "Except A e=\n  Pass\n");
  EXPECT_EQ(SyntaxText("except A, B: pass\n"), "Except (Tuple A B)\n  Pass\n");
}

TEST(Syntax, Blocks) {
  EXPECT_EQ(SyntaxText("if a:\n  b\n\n  # c\n  d\nelif e: f; g\nelse:\n\th\n        i\nj\n"),
            "If a\n  Expression b\n  Expression d\nElif e\n  Expression f\n  Expression g\nElse\n  Expression h\n"
            "  Expression i\nExpression j\n");
  EXPECT_EQ(SyntaxText("for a, b in c, d:\n  while e: pass\nasync for f in g: pass\n"),
            "For (Tuple a= b=) (Tuple c d)\n  While e\n    Pass\nFor~ f= g\n  Pass\n");
  EXPECT_EQ(SyntaxText("try:\n  a\nexcept* (A, B) as e:\n  b\nfinally:\n  c\n"),
            "Try\n  Expression a\nExcept* (Tuple A B)() e=\n  Expression b\nFinally\n  Expression c\n");
  EXPECT_EQ(SyntaxText("with a as b, (c): pass\nwith (a as b, c,): pass\nwith (a, b) as c: pass\n"),
            "With (WithItem a b=) (WithItem c)\n  Pass\nWith (WithItem a b=) (WithItem c)\n  Pass\n"
            "With (WithItem (Tuple a b)() c=)\n  Pass\n");
  EXPECT_EQ(SyntaxText("with (a, b): pass\n", Version::Of(3, 8)), "With (WithItem (Tuple a b)())\n  Pass\n");
}

TEST(Syntax, Definitions) {
  EXPECT_EQ(SyntaxText("@a.b(c)\n# d\n@e\nasync def f[T: int = str, *U, **V](a, /, b: 'C' = 1, *, d, **e) -> 'T':\n"
                       "  yield\n  return a\n"),
            "Def~ yields returns 'f' @(Call (Attribute 'b' a) c) @e [(TypeParameter 'T' int str)] [(TypeParameter#1 "
            "'U')] [(TypeParameter#2 'V')] (Parameter 'a') (Parameter#4) (Parameter 'b' (String C): 1) (Parameter#3) "
            "(Parameter 'd') (Parameter#2 'e') : (String T):\n  Expression (Yield)\n  Return a\n");
  EXPECT_EQ(SyntaxText("class C[T](B, metaclass=M, *a): x = 1; y\nz\n"),
            "Class 'C' [(TypeParameter 'T')] B (Keyword 'metaclass' M) (Starred a)\n  Assign x= 1\n  Expression y\n"
            "Expression z\n");
  EXPECT_EQ(SyntaxText("type A[T] = list[T]\ntype = 1\n"),
            "TypeAlias 'A' [(TypeParameter 'T')] (Subscript list T)\nAssign type= 1\n");
  EXPECT_EQ(SyntaxText("def f():\n  def g(): yield\n  class C: return 1\n  lambda: (yield)\n  return\n"),
            "Def 'f'\n  Def yields 'g'\n    Expression (Yield)\n  Class 'C'\n    Return 1\n"
            "  Expression (Lambda (Yield)())\n  Return\n");
}

TEST(Syntax, Patterns) {
  EXPECT_EQ(SyntaxText("match a, b:\n  case 1 | -2 | 'x' | None: pass\n  case [a, *_] | (b,) | (c): pass\n"),
            "Match (Tuple a b)\n  Case (PatternOr (PatternValue 1) (PatternValue (Unary#15 2)) (PatternValue 'x') "
            "(PatternValue None))\n    Pass\n  Case (PatternOr (PatternSequence (PatternCapture 'a') (PatternStar)) "
            "(PatternSequence (PatternCapture 'b'))() (PatternCapture 'c')())\n    Pass\n");
  EXPECT_EQ(
      SyntaxText("match a:\n  case {'k': v, **r} if g: pass\n  case C.D(x, y=E.F) as z, *q: pass\n  case _: pass\n"),
      "Match a\n  Case (PatternMapping 'k' (PatternCapture 'v') (PatternStar 'r') -) g\n    Pass\n"
      "  Case (PatternSequence (PatternAs (PatternClass (Attribute 'D' C) (PatternCapture 'x') (Keyword 'y' "
      "(PatternValue (Attribute 'F' E)))) z=) (PatternStar 'q'))\n    Pass\n  Case (PatternCapture)\n    Pass\n");
  EXPECT_EQ(SyntaxText("match = case\nmatch(x)\n"), "Assign match= case\nExpression (Call match x)\n");
}

// ---- hints ----

TEST(Syntax, HintsInStrings) {
  EXPECT_EQ(SyntaxText("x: 'List[\"A\"]' = cast('B', c)\n"),
            "Annotated x= (Call cast (String B): c) : (String (Subscript List (String A):)):\n");
  EXPECT_EQ(SyntaxText("def f(a: Literal['b'], c: Annotated['D', 'e'], g: 'no hint at all') -> None: pass\n"),
            "Def 'f' (Parameter 'a' (Subscript Literal 'b')) (Parameter 'c' (Subscript Annotated (String D): 'e')) "
            "(Parameter 'g' 'no hint at all') : None\n  Pass\n");
}

TEST(Syntax, HintsInComments) {
  EXPECT_EQ(SyntaxText("x = []  # type: List[int]\nfor a in b:  # type: str\n  c  # type: ignore\n"),
            "Assign x= (List) #: (Subscript List int)\nFor a= b #: str\n  Expression c\n");
  EXPECT_EQ(SyntaxText("with a as b:  # type: C\n  pass\nx = 1 # type: some prose\n"),
            "With (WithItem a b=) #: C\n  Pass\nAssign x= 1\n");
  EXPECT_EQ(
      SyntaxText(
          "def f(a,  # type: int\n      *b,\n      c=1  # type: str\n      ):\n  # type: (...) -> None\n  pass\n"),
      "Def 'f' (Parameter 'a' int) (Parameter#1 'b') (Parameter 'c' str 1) #: (SignatureHint ... None)\n  Pass\n");
  EXPECT_EQ(SyntaxText("def f(a, *b):  # type: (int, *'str') -> C\n  pass\n"),
            "Def 'f' (Parameter 'a') (Parameter#1 'b') #: (SignatureHint int (Starred 'str') C)\n  Pass\n");
}

TEST(Syntax, AHintStandsInItsString) {
  const ReadSource read("def f(a: 'B.c'): pass\n");
  EXPECT_EQ(read.file.NameOf(read.file.NamedAt(12)), "c");
  EXPECT_EQ(read.file[read.file.NamedAt(10)].kind, ExprKind::kName);
}

// ---- what is just being typed ----

TEST(Syntax, NamesThatAreMissing) {
  EXPECT_EQ(SyntaxText("x.\ny = 1\n"), "Expression! (Attribute x)!\nAssign y= 1\n");
  EXPECT_EQ(SyntaxText("return x.\n"), "Return! (Attribute x)!\n");
  EXPECT_EQ(SyntaxText("self.is\nself.a.import\n"),
            "Expression (Attribute 'is' self)\nExpression (Attribute 'import' (Attribute 'a' self))\n");
  EXPECT_EQ(SyntaxText("f(x., y)\n"), "Expression! (Call f (Attribute x)! y)!\n");
  EXPECT_EQ(SyntaxText("x.\n"), SyntaxText("x."));
}

TEST(Syntax, ExpressionsThatAreMissing) {
  EXPECT_EQ(SyntaxText("x = \n"), "Assign! x= ?\n");
  EXPECT_EQ(SyntaxText("x + \n"), "Expression! (Binary#14 x ?)\n");
  EXPECT_EQ(SyntaxText("x if y\n"), "Expression! (Conditional x y ?)\n");
  EXPECT_EQ(SyntaxText("for x in \n"), "For! x= ?\n");
  EXPECT_EQ(SyntaxText("for \n"), "For! ? ?\n");
  EXPECT_EQ(SyntaxText("with open(p) as \n"), "With! (WithItem (Call open p) ?)\n");
  EXPECT_EQ(SyntaxText("if :\n  x\n"), "If! ?\n  Expression x\n");
  EXPECT_EQ(SyntaxText("x: \n"), "Annotated! x= : ?\n");
  EXPECT_EQ(SyntaxText("{a: , b}\n"), "Expression! (Dict a ? b ?)!\n");
  EXPECT_EQ(SyntaxText("import \nimport a.\nimport a as \n"),
            "Import! (ImportAlias (ModulePath)!)\nImport! (ImportAlias (ModulePath a ?)!)\n"
            "Import! (ImportAlias (ModulePath a) ?)\n");
  EXPECT_EQ(SyntaxText("from a.\nfrom a import \nfrom .\nfrom\n"),
            "FromImport! (ModulePath a ?)!\nFromImport! (ModulePath a)\nFromImport! (ModulePath#1)\n"
            "FromImport! (ModulePath)!\n");
}

TEST(Syntax, BracketsThatAreOpen) {
  EXPECT_EQ(SyntaxText("foo(bar, \n"), "Expression! (Call foo bar)!\n");
  EXPECT_EQ(SyntaxText("foo(a b)\n"), "Expression! (Call foo a b)!\n");
  EXPECT_EQ(SyntaxText("foo(a=\n"), "Expression! (Call foo (Keyword 'a' ?))!\n");
  EXPECT_EQ(SyntaxText("foo(a, [b, c)\nd\n"), "Expression! (Call foo a (List b c)!)!\nExpression d\n");
  EXPECT_EQ(SyntaxText("def f(\nclass C(\n"), "Def! 'f'\nClass! 'C'\n");
  EXPECT_EQ(SyntaxText("x = (\n"), "Assign! x= ?\n");
  EXPECT_EQ(SyntaxText("x[\n"), "Expression! (Subscript x)!\n");
}

// What stands below, no deeper, is code of its own.
TEST(Syntax, LinesBehindAnOpenBracket) {
  EXPECT_EQ(SyntaxText("def f(self):\n    x = foo(bar,\n    self.y = 3\n    z = [\n      1]\n    return x\n"),
            "Def returns 'f' (Parameter 'self')\n  Assign! x= (Call foo bar)!\n  Assign (Attribute 'y' self)= 3\n"
            "  Assign z= (List 1)\n  Return x\n");
  EXPECT_EQ(SyntaxText("def f(a:\n    x = 1\n    return x\n"),
            "Def returns! 'f' (Parameter 'a' ?)\n  Assign x= 1\n  Return x\n");
  EXPECT_EQ(SyntaxText("if foo(\n    return 1\n"), "If! (Call foo)!\n  Return 1\n");
  EXPECT_EQ(SyntaxText("x = foo(a,\n  b\n)\n"), "Assign x= (Call foo a b)\n");
  EXPECT_EQ(SyntaxText("x = {\n'a': 1,\ny = 2\n"), "Assign! x= (Dict)!\nAnnotated 'a' : (Tuple 1),\nAssign y= 2\n");
}

TEST(Syntax, WhatIsLeftOver) {
  EXPECT_EQ(SyntaxText("x y z\n"), "Expression! x\nBroken! y z\n");
  EXPECT_EQ(SyntaxText("if x y:\n  z\n"), "If! x\n  Broken! y\n  Expression z\n");
  EXPECT_EQ(SyntaxText("else if x:\n  y\n"), "Else!\n  If x\n    Expression y\n");
  EXPECT_EQ(SyntaxText("x = return y\n"), "Assign! x= ?\nReturn y\n");
  EXPECT_EQ(SyntaxText(") x\n$\n= 1\n"), "Broken! x\nBroken!\nBroken! 1\n");
  EXPECT_EQ(SyntaxText("@a\nx\n@b\n"), "Broken! a\nExpression x\nBroken! b\n");
  EXPECT_EQ(SyntaxText("def\nclass\ndef f\n  x\n"), "Def!\nClass!\nDef! 'f'\n  Expression x\n");
  EXPECT_EQ(SyntaxText("f(a.b=1)\n"), "Expression! (Call f (Attribute 'b' a) 1)!\n");
}

// What nests deeper than it is read is left out, and what it is left out of says so.
TEST(Syntax, BracketsThatNestTooDeep) {
  const auto nested = [](size_t depth, Text opening, Text closing) {
    std::string text;
    for (size_t i = 0; i < depth; ++i) text += opening;
    text += "here";
    for (size_t i = 0; i < depth; ++i) text += closing;
    return SyntaxText(text + "\n");
  };
  for (const auto& [opening, closing] :
       std::vector<std::pair<Text, Text>>{{"f(", ")"}, {"a[", "]"}, {"[", "]"}, {"{", "}"}}) {
    EXPECT_EQ(nested(60, opening, closing).find('!'), std::string::npos) << opening;
    const std::string deep = nested(500, opening, closing);
    const std::string innermost = deep.substr(0, deep.find(')') + 2);
    EXPECT_TRUE(innermost.ends_with(")!")) << innermost;
    EXPECT_EQ(deep.find("here"), std::string::npos) << opening;
  }
}

// ---- places ----

TEST(Syntax, NamesAreFoundWhereTheyBegin) {
  const ReadSource read("import a.b\n@c\ndef f(x, *y): return x.z(k=1)\n");
  const FileSyntax& file = read.file;
  const auto kind_at = [&](const char* what) {
    const size_t place = read.source->text().find(what);
    return WordOf(file[file.NamedAt(static_cast<uint32_t>(place))].kind);
  };
  EXPECT_EQ(kind_at("a.b"), "Name");
  EXPECT_EQ(kind_at("b\n"), "Name");
  EXPECT_EQ(kind_at("x,"), "Parameter");
  EXPECT_EQ(kind_at("y)"), "Parameter");
  EXPECT_EQ(kind_at("z("), "Attribute");
  EXPECT_EQ(kind_at("k="), "Keyword");
  EXPECT_EQ(kind_at("f("), "Missing");
  EXPECT_EQ(file.stmt(file.StatementNamedAt(18)).kind, StmtKind::kDef);
  EXPECT_EQ(file.StatementNamedAt(19), kModuleStmt);
}

TEST(Syntax, StatementsAreFoundByPlace) {
  const Text source = "@d\ndef f():\n  x = 1\n\n  if y:\n    z\nw\n";
  const ReadSource read(source);
  const auto at = [&](uint32_t place) { return WordOf(read.file.stmt(read.file.StatementAt(place)).kind); };
  EXPECT_EQ(at(0), "Def");
  EXPECT_EQ(at(1), "Def");
  EXPECT_EQ(at(8), "Def");
  EXPECT_EQ(at(static_cast<uint32_t>(source.find("= 1"))), "Assign");
  EXPECT_EQ(at(static_cast<uint32_t>(source.find("\n\n"))), "Assign");
  EXPECT_EQ(at(static_cast<uint32_t>(source.find("\n\n")) + 1), "Def");
  EXPECT_EQ(at(static_cast<uint32_t>(source.find("y:"))), "If");
  EXPECT_EQ(at(static_cast<uint32_t>(source.find("z\n"))), "Expression");
  EXPECT_EQ(at(static_cast<uint32_t>(source.find("w\n"))), "Expression");
  EXPECT_EQ(at(static_cast<uint32_t>(source.size())), "Module");
}

TEST(Syntax, ExpressionsAreFoundByPlace) {
  const Text source = "@dec\ndef f(a: int = 1): return foo.bar(b, (c))  # type: ignore\nx = y  # type: Z\n";
  const ReadSource read(source);
  const auto at = [&](const char* what, uint32_t more = 0) {
    const ExprId expr = read.file.ExpressionAt(static_cast<uint32_t>(source.find(what)) + more);
    return testing::ExprText(read.file, expr);
  };
  EXPECT_EQ(at("dec"), "dec");
  EXPECT_EQ(at("int"), "int");
  EXPECT_EQ(at("a: int"), "(Parameter 'a' int 1)");
  EXPECT_EQ(at("foo"), "foo");
  EXPECT_EQ(at(".bar"), "foo");
  EXPECT_EQ(at("bar"), "(Attribute 'bar' foo)");
  EXPECT_EQ(at("(b"), "(Attribute 'bar' foo)");
  EXPECT_EQ(at("(b", 1), "b");
  EXPECT_EQ(at("(c"), "(Call (Attribute 'bar' foo) b c())");
  EXPECT_EQ(at("(c", 2), "c()");
  EXPECT_EQ(at("Z"), "Z");
  EXPECT_EQ(at("def"), "-");
  const ReadSource list("[a1, a2, a3, a4, a5, a6, a7, a8, a9, b1, {**c1, **c2, **c3, **c4, **c5}]");
  for (uint32_t place = 1; place < 39; place += 4)
    EXPECT_EQ(list.file[list.file.ExpressionAt(place)].begin, place) << place;
  EXPECT_EQ(list.file.NameOf(list.file.ExpressionAt(static_cast<uint32_t>(list.source->text().find("c4")))), "c4");
}

TEST(Syntax, AnExpressionKnowsItsStatement) {
  const ReadSource read("@a\ndef f(b=c):\n  d = e\n");
  const FileSyntax& file = read.file;
  const auto statement_of = [&](const char* what) {
    return WordOf(
        file.stmt(file.StatementOf(file.NamedAt(static_cast<uint32_t>(read.source->text().find(what))))).kind);
  };
  EXPECT_EQ(statement_of("a\n"), "Def");
  EXPECT_EQ(statement_of("c)"), "Def");
  EXPECT_EQ(statement_of("e\n"), "Assign");
}

TEST(Syntax, AnExpressionOfABrokenStatementBelongsToIt) {
  for (const Text source : {"if a:\n  b c(mark, d\n", "def f():\n  x = y z mark\n", "class A:\n  ) + mark\n"}) {
    const ReadSource read(source);
    const ExprId mark = read.file.NamedAt(static_cast<uint32_t>(source.find("mark")));
    ASSERT_NE(mark, kNoExpr) << source;
    const StmtId stmt = read.file.StatementOf(mark);
    EXPECT_EQ(stmt, read.file.StatementAt(static_cast<uint32_t>(source.find("mark")))) << source;
    EXPECT_NE(stmt, 1u) << source << " (that is the head)";
  }
}

TEST(Syntax, WhatIsMissingBelongsInFrontOfWhatFollows) {
  for (const Text source : {"x:class A: pass", "x =]", "if x=:y"}) {
    const ReadSource read(source);
    const Stmt& first = read.file.stmt(1);
    const ExprId last = first.hint != kNoExpr ? first.hint : read.file.ExprsOf(first).back();
    EXPECT_EQ(read.file.StatementOf(last), 1u) << source;
  }
}

TEST(Syntax, BracketsOfItsOwnAreNoPartOfAnExpression) {
  const ReadSource read("x = ((a) + b)\ny = (c, d)\n");
  const FileSyntax& file = read.file;
  EXPECT_EQ(file.TextOf(file[file.ExprsOf(file.stmt(1))[1]]), "(a) + b");
  EXPECT_EQ(file.TextOf(file[file.ExprsOf(file.stmt(2))[1]]), "(c, d)");
}

TEST(Syntax, PatternsThatAreNotClosedAreBroken) {
  const auto pattern = [](const char* text) {
    return SyntaxText(std::string("match a:\n case ") + text + ": pass\n")
        .substr(std::string("Match a\n  Case").size());
  };
  EXPECT_EQ(pattern("A(b)"), " (PatternClass A (PatternCapture 'b'))\n    Pass\n");
  EXPECT_EQ(pattern("A(b]"), "! (PatternClass A (PatternCapture 'b'))!\n");
  EXPECT_EQ(pattern("[b)"), "! (PatternSequence (PatternCapture 'b'))!\n");
  EXPECT_EQ(pattern("{'b': c)"), "! (PatternMapping 'b' (PatternCapture 'c'))!\n");
  EXPECT_EQ(pattern("A(b c)"), "! (PatternClass A (PatternCapture 'b') (PatternCapture 'c'))!\n    Pass\n");
}

TEST(Syntax, NothingIsLeftOfAStringThatIsNoHint) {
  const Text source = "x: 'A B' = c\ny = d  # type: E F\n";
  const ReadSource read(source);
  const auto named_at = [&](Text name) { return read.file.NamedAt(static_cast<uint32_t>(source.find(name))); };
  for (const ExprId named : read.file.named) ASSERT_LT(named, read.file.exprs.size());
  for (const Text gone : {"A", "B", "E", "F"}) EXPECT_EQ(named_at(gone), kNoExpr) << gone;
  for (const Text name : {"x", "c", "y =", "d"}) {
    ASSERT_NE(named_at(name), kNoExpr) << name;
    EXPECT_EQ(read.file.NameOf(named_at(name)), name.substr(0, 1));
  }
}

TEST(Syntax, AGeneratorHasTheBracketsThatItNeeds) {
  for (const auto& [source, text] : {std::pair<Text, Text>("x = (a for a in b)\n", "(a for a in b)"),
                                     {"x = ((a for a in b))\n", "(a for a in b)"},
                                     {"f(a for a in b)\n", "(a for a in b)"},
                                     {"f((a for a in b))\n", "(a for a in b)"},
                                     {"x = (a for a in b), c\n", "(a for a in b)"}}) {
    const ReadSource read(source);
    const auto generator = std::ranges::find(read.file.exprs, ExprKind::kGenerator, &Expr::kind);
    ASSERT_NE(generator, read.file.exprs.end()) << source;
    EXPECT_EQ(read.file.TextOf(*generator), text) << source;
  }
}

TEST(Syntax, AnEmptySourceIsAModule) {
  EXPECT_EQ(SyntaxText(""), "");
  const ReadSource read("# nothing\n\n");
  EXPECT_EQ(read.file.StatementAt(3), kModuleStmt);
  EXPECT_EQ(read.file.ExpressionAt(3), kNoExpr);
  EXPECT_EQ(FileSyntax().StatementAt(0), kModuleStmt);
  EXPECT_EQ(FileSyntax().NamedAt(0), kNoExpr);
}

}  // namespace
}  // namespace quillet
