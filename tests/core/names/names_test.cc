// What each form of a statement says about its names: role, kind, flags, receiver, scope and owner.
#include <gtest/gtest.h>

#include <string>

#include "tests/core/support/names_helper.h"

namespace quillet::testing {
namespace {

constexpr Version kPy27 = Version::Of(2, 7);
constexpr Version kPy36 = Version::Of(3, 6);
constexpr Version kPy38 = Version::Of(3, 8);
constexpr Version kPy312 = Version::Of(3, 12);
constexpr Version kPy314 = Version::Of(3, 14);

// ---- reads, calls, attributes ----

TEST(Names, ReadsAndCalls) {
  EXPECT_EQ(NamesOf("f(a, b(), *c, **d)\n"), "f=call a=read b=call c=read d=read");
  EXPECT_EQ(NamesOf("a [0] (x)\n"), "a=read x=read");
  EXPECT_EQ(NamesOf("not (a) or -(b)\n"), "a=read b=read");
  EXPECT_EQ(NamesOf("(f)(x)\n(a # c\n.b)(y)\n"), "f=call x=read a=read b=call<a y=read");
  EXPECT_EQ(NamesOf("(f or g)(x)\n"), "f=read g=read x=read");
}

TEST(Names, KeywordsAndConstantsAreNoNames) {
  EXPECT_EQ(NamesOf("None is True or not False\n"), "");
  EXPECT_EQ(NamesOf("while x: pass\n"), "x=read");
  EXPECT_EQ(NamesOf("match = case = type = _ = 1\n"),
            "match=write/variable case=write/variable type=write/variable _=write/variable");
}

TEST(Names, AttributesKnowTheirReceiver) {
  EXPECT_EQ(NamesOf("a.b.c()\n"), "a=read b=read<a c=call<b");
  EXPECT_EQ(NamesOf("(a).b\n"), "a=read b=read<a");
  EXPECT_EQ(NamesOf("((a.b)).c\n"), "a=read b=read<a c=read<b");
  EXPECT_EQ(NamesOf("a().b\n"), "a=call b=read<");
  EXPECT_EQ(NamesOf("a[i].b\n"), "a=read i=read b=read<");
  EXPECT_EQ(NamesOf("(a or b).c\n"), "a=read b=read c=read<");
  EXPECT_EQ(NamesOf("(a,).c\n"), "a=read c=read<");
  EXPECT_EQ(NamesOf("(-a).c\n"), "a=read c=read<");
  EXPECT_EQ(NamesOf("(x := a).c\n"), "x=write/variable a=read c=read<");
  EXPECT_EQ(NamesOf("[a].c\n"), "a=read c=read<");
  EXPECT_EQ(NamesOf("'s'.join(a)\n"), "join=call< a=read");
  EXPECT_EQ(NamesOf("a.b = (a # type: int\n .c)\n"), "a=read b=write<a a=read int=read+annotation+comment c=read<a");
}

TEST(Names, KeywordNamesOfCalls) {
  EXPECT_EQ(NamesOf("f(x, k=v, **o)\n"), "f=call x=read k=keyword v=read o=read");
  EXPECT_EQ(NamesOf("f((k==v), g(k=1))\n"), "f=call k=read v=read g=call k=keyword");
  EXPECT_EQ(NamesOf("f(a\n=1)\n"), "f=call a=keyword");
}

// ---- targets ----

TEST(Names, AssignmentsWriteTheirTargets) {
  EXPECT_EQ(NamesOf("a = b = c\n"), "a=write/variable b=write/variable c=read");
  EXPECT_EQ(NamesOf("a, (b, *c), [d] = e\n"),
            "a=write/variable b=write/variable c=write/variable d=write/variable e=read");
  EXPECT_EQ(NamesOf("a[i].b = c\n"), "a=read i=read b=write< c=read");
  EXPECT_EQ(NamesOf("a[i] = f(x).y = z\n"), "a=read i=read f=call x=read y=write< z=read");
  EXPECT_EQ(NamesOf("(a).b = (c.d) = e\n"), "a=read b=write<a c=read d=write<c e=read");
  EXPECT_EQ(NamesOf("(a, b)[0].c = d\n"), "a=read b=read c=write< d=read");
  EXPECT_EQ(NamesOf("x += y\n"), "x=write/variable+augmented y=read");
  EXPECT_EQ(NamesOf("x -= y\n"), "x=write/variable+augmented y=read");
  EXPECT_EQ(NamesOf("x @= y\n"), "x=write/variable+augmented y=read");
  EXPECT_EQ(NamesOf("x.y **= z\n"), "x=read y=write+augmented<x z=read");
  EXPECT_EQ(NamesOf("f = lambda: a == b\n"), "f=write/variable a=read@lambda^module b=read@lambda^module");
}

TEST(Names, AnnotatedVariables) {
  EXPECT_EQ(NamesOf("x: int = y\n"), "x=write/variable int=read+annotation y=read");
  EXPECT_EQ(NamesOf("x: int\n"), "x=definition/variable int=read+annotation");
  EXPECT_EQ(NamesOf("(x): A[b]\n"), "x=definition/variable A=read+annotation b=read+annotation");
  EXPECT_EQ(NamesOf("self.x: int\n"), "self=read x=definition<self int=read+annotation");
  EXPECT_EQ(NamesOf("x: lambda: y = z\n"), "x=write/variable y=read+annotation@lambda^module z=read");
  EXPECT_EQ(NamesOf("a[x]: int = y\n"), "a=read x=read int=read+annotation y=read");
}

TEST(Names, OtherTargets) {
  EXPECT_EQ(NamesOf("for a, b.c, d[e] in f: g\n"), "a=write/variable b=read c=write<b d=read e=read f=read g=read");
  EXPECT_EQ(NamesOf("for x in a, b: y = x\n"), "x=write/variable a=read b=read y=write/variable x=read");
  EXPECT_EQ(NamesOf("async for x in y: pass\n"), "x=write/variable y=read");
  EXPECT_EQ(NamesOf("with a as b, c() as (d, e.f), g: h = i\n"),
            "a=read b=write/variable c=call d=write/variable e=read f=write<e g=read h=write/variable i=read");
  EXPECT_EQ(NamesOf("with (a as b, c as d[0],): pass\n"), "a=read b=write/variable c=read d=read");
  EXPECT_EQ(NamesOf("except (A, B.c) as e: raise\n"), "A=read B=read c=read<B e=write/variable");
  EXPECT_EQ(NamesOf("except* A as e: pass\n"), "A=read e=write/variable");
  EXPECT_EQ(NamesOf("except A, B: pass\n", kPy314), "A=read B=read");
  EXPECT_EQ(NamesOf("del a, (b.c, d[e]), [f]\n"), "a=delete b=read c=delete<b d=read e=read f=delete");
  EXPECT_EQ(NamesOf("if (n := f(a)) > n: pass\n"), "n=write/variable f=call a=read n=read");
  EXPECT_EQ(NamesOf("f(n := a, k=(m := b))\n"), "f=call n=write/variable a=read k=keyword m=write/variable b=read");
}

TEST(Names, BodiesOnTheLineOfTheirHead) {
  EXPECT_EQ(NamesOf("if a: b = c; d.e = f\n"), "a=read b=write/variable c=read d=read e=write<d f=read");
  EXPECT_EQ(NamesOf("else: x: int = y\n"), "x=write/variable int=read+annotation y=read");
  EXPECT_EQ(NamesOf("while lambda: a: del b\n"), "a=read@lambda^module b=delete");
  EXPECT_EQ(NamesOf("if x[a:b]: import c\n"), "x=read a=read b=read c=import/import");
  EXPECT_EQ(NamesOf("class A: x = y\n"), "A=definition/class x=write/variable@A y=read@A^module");
}

// ---- imports and declarations ----

TEST(Names, Imports) {
  EXPECT_EQ(
      NamesOf("import a.b.c, d as e, f.g as h\n"),
      "a=import/import b=import<a c=import<b d=import e=definition/import f=import g=import<f h=definition/import");
  EXPECT_EQ(NamesOf("from a.b import (c, d as e, # type: ignore\n f)\n"),
            "a=import b=import<a c=import/import d=import e=definition/import f=import/import");
  EXPECT_EQ(NamesOf("from . import a\nfrom ...b import c\n"), "a=import/import b=import c=import/import");
  EXPECT_EQ(NamesOf("from a import *\n"), "a=import");
  NameBinder binder(kPy312);
  const Bindings& star = binder.Bind("def f():\n  pass\nfrom a import *\n");
  EXPECT_TRUE(star.scopes[0].has_star_import);
  EXPECT_FALSE(star.scopes[1].has_star_import);
}

TEST(Names, Declarations) {
  EXPECT_EQ(NamesOf("def f():\n  x\n  global x, y\n  x = y\n"),
            "f=definition/function x=read@f^module x=declaration@f^module y=declaration@f^module "
            "x=write/variable@f^module y=read@f^module");
  EXPECT_EQ(NamesOf("def f():\n  x = 1\n  def g():\n    nonlocal x\n    x = 2\n"),
            "f=definition/function x=write/variable@f g=definition/function@f x=declaration@g^f x=write/variable@g^f");
}

// ---- definitions ----

TEST(Names, Functions) {
  EXPECT_EQ(NamesOf("def f(a, /, b: T = d, *c: U, e=a, **k) -> R: return a\n"),
            "f=definition/function a=definition/parameter@f b=definition/parameter@f T=read+annotation d=read "
            "c=definition/parameter@f U=read+annotation e=definition/parameter@f a=read k=definition/parameter@f "
            "R=read+annotation a=read@f");
  EXPECT_EQ(NamesOf("async def f(*, a):\n  await a\n"), "f=definition/function a=definition/parameter@f a=read@f");
  EXPECT_EQ(NamesOf("@a.b(c)\n@d\ndef f(): pass\n"),
            "a=read b=call+decorator<a c=read d=read+decorator f=definition/function");
  EXPECT_EQ(NamesOf("def f(a=lambda b=c: b, d=1): pass\n"),
            "f=definition/function a=definition/parameter@f b=definition/parameter@lambda c=read b=read@lambda "
            "d=definition/parameter@f");
  EXPECT_EQ(NamesOf("def f(a: lambda x: x, b): pass\n"),
            "f=definition/function a=definition/parameter@f x=definition/parameter+annotation@lambda "
            "x=read+annotation@lambda b=definition/parameter@f");
}

TEST(Names, Classes) {
  EXPECT_EQ(NamesOf("class A(B, c.D[T], *E, metaclass=M, **k): pass\n"),
            "A=definition/class B=read+base c=read D=read+base<c T=read E=read+base metaclass=keyword M=read k=read");
  EXPECT_EQ(NamesOf("class A(f(x), k=v):\n  y = A\n"),
            "A=definition/class f=call+base x=read k=keyword v=read y=write/variable@A A=read@A^module");
  // What is nested in a class does not see its names.
  EXPECT_EQ(NamesOf("class A:\n  x = 1\n  def f(self): x\n"),
            "A=definition/class x=write/variable@A f=definition/function@A self=definition/parameter@f "
            "x=read@f^module");
}

TEST(Names, Lambdas) {
  EXPECT_EQ(NamesOf("f(lambda x, *y, z=w: x + z, v)\n"),
            "f=call x=definition/parameter@lambda y=definition/parameter@lambda z=definition/parameter@lambda w=read "
            "x=read@lambda z=read@lambda v=read");
  EXPECT_EQ(NamesOf("{lambda: a: b}\n"), "a=read@lambda^module b=read");
  EXPECT_EQ(NamesOf("x[lambda: a: lambda: b]\n"), "x=read a=read@lambda^module b=read@lambda^module");
  EXPECT_EQ(NamesOf("(lambda: lambda x: x).y\n"), "x=definition/parameter@lambda x=read@lambda y=read<");
}

TEST(Names, TypeParameters) {
  EXPECT_EQ(NamesOf("def f[T: B = D, *Ts, **P](x: T = y) -> T: T\n"),
            "f=definition/function T=definition/type_parameter@[f] B=read@annotation^module D=read@annotation^module "
            "Ts=definition/type_parameter@[f] P=definition/type_parameter@[f] x=definition/parameter@f "
            "T=read+annotation@[f] y=read T=read+annotation@[f] T=read@f^[f]");
  EXPECT_EQ(NamesOf("class A[T](B[T], k=v): x: T\n"),
            "A=definition/class T=definition/type_parameter@[A] B=read+base@[A]^module T=read@[A] k=keyword@[A] "
            "v=read@[A]^module x=definition/variable@A T=read+annotation@A^[A]");
  EXPECT_EQ(NamesOf("type X[T] = L[T]\ntype Y = X\ntype(x)\ntype = 3\n"),
            "X=definition/type_alias T=definition/type_parameter@[X] L=read@annotation^module T=read@annotation^[X] "
            "Y=definition/type_alias X=read@annotation^module type=call x=read type=write/variable");
  // The names of the class around are visible to both.
  EXPECT_EQ(NamesOf("class C:\n  x = 1\n  def f[T: x](a: x): x\n  type Y = x\n"),
            "C=definition/class x=write/variable@C f=definition/function@C T=definition/type_parameter@[f] "
            "x=read@annotation^C a=definition/parameter@f x=read+annotation@[f]^C x=read@f^module "
            "Y=definition/type_alias@C x=read@annotation^C");
}

// ---- comprehensions ----

TEST(Names, Comprehensions) {
  EXPECT_EQ(NamesOf("[x + y for x in z if w]\n"),
            "x=read@comprehension y=read@comprehension^module x=write/variable@comprehension z=read "
            "w=read@comprehension^module");
  EXPECT_EQ(NamesOf("{k: v for k, v.a in z for b in k}\n"),
            "k=read@comprehension v=read@comprehension^module k=write/variable@comprehension "
            "v=read@comprehension^module a=write<v@comprehension z=read b=write/variable@comprehension "
            "k=read@comprehension");
  EXPECT_EQ(NamesOf("f(x async for x in y)\n"), "f=call x=read@comprehension x=write/variable@comprehension y=read");
  EXPECT_EQ(NamesOf("[[a for a in b] for b in c]\n"),
            "a=read@comprehension a=write/variable@comprehension b=read@comprehension b=write/variable@comprehension "
            "c=read");
  EXPECT_EQ(NamesOf("[lambda: x for x in y]\n"), "x=read@lambda^comprehension x=write/variable@comprehension y=read");
  EXPECT_EQ(NamesOf("(x for x in [y for y in z])\n"),
            "x=read@comprehension x=write/variable@comprehension y=read@comprehension y=write/variable@comprehension "
            "z=read");
  // In a class the first iterable alone sees its names.
  EXPECT_EQ(NamesOf("class A:\n  b = 1\n  [b for _ in b]\n"),
            "A=definition/class b=write/variable@A b=read@comprehension^module _=write/variable@comprehension "
            "b=read@A");
}

TEST(Names, AssignmentExpressionsBindOutsideOfComprehensions) {
  EXPECT_EQ(NamesOf("def f():\n  [[y := x for x in z] for z in w]\n  y\n"),
            "f=definition/function y=write/variable@comprehension^f x=read@comprehension "
            "x=write/variable@comprehension z=read@comprehension z=write/variable@comprehension w=read@f^module "
            "y=read@f");
  EXPECT_EQ(NamesOf("[y := x for x in z]\n"),
            "y=write/variable@comprehension^module x=read@comprehension x=write/variable@comprehension z=read");
  EXPECT_EQ(NamesOf("[lambda: (y := x) for x in z]\n"),
            "y=write/variable@lambda x=read@lambda^comprehension x=write/variable@comprehension z=read");
}

// ---- patterns ----

TEST(Names, Patterns) {
  EXPECT_EQ(NamesOf("match x, *y:\n"), "x=read y=read");
  EXPECT_EQ(NamesOf("match x:\n  case a.b | C(d, e=f) | {g.h: i, **j} as k if a == k: l = a\n"),
            "x=read a=read b=read<a C=read d=write/variable e=keyword f=write/variable g=read h=read<g "
            "i=write/variable j=write/variable k=write/variable a=read k=read l=write/variable a=read");
  EXPECT_EQ(NamesOf("match x:\n  case [a, *_, (b), _]: pass\n  case _: pass\n"),
            "x=read a=write/variable b=write/variable");
  EXPECT_EQ(NamesOf("match x:\n  case m.C(): pass\n  case {'a': -1}: pass\n"), "x=read m=read C=read<m");
  EXPECT_EQ(NamesOf("match(x)\ncase = match[y]\n"), "match=call x=read case=write/variable match=read y=read");
}

// ---- strings and comments ----

TEST(Names, FormattedStrings) {
  EXPECT_EQ(NamesOf("f'{a.b!r:{w}}{c=}' f\"{d['k']}\"\n"), "a=read b=read<a w=read c=read d=read");
  EXPECT_EQ(NamesOf("f'{f\"{a}{f'{b}'}\"} {c}'\n"), "a=read b=read c=read");
  EXPECT_EQ(NamesOf("f'{x for x in y}'.z\n"), "x=read x=write/variable y=read z=read<");
  EXPECT_EQ(NamesOf("f'{[x for x in y]}'\n"), "x=read@comprehension x=write/variable@comprehension y=read");
  EXPECT_EQ(NamesOf("def f(): return f'{(lambda x: x)(y)}'\n"),
            "f=definition/function x=definition/parameter@lambda x=read@lambda y=read@f^module");
  EXPECT_EQ(NamesOf("x = '{a}' + rb'{b}'\n"), "x=write/variable");
  EXPECT_EQ(NamesOf("t'{a}' + T\n", kPy314), "a=read T=read");
  EXPECT_EQ(NamesOf("x = tR\"{a[\"b\"]} {c}\".d\n", kPy314), "x=write/variable a=read c=read d=read<");
  EXPECT_EQ(NamesOf("f(t'{a', b)\n", kPy314), "f=call a=read b=read");
  EXPECT_EQ(NamesOf("t\"{t'{a['c']}'}{b}\" f\"{t'{d['e']}'}\"\n", kPy314), "a=read b=read d=read");
  // A prefix touches its string.
  EXPECT_EQ(NamesOf("(t#{a}\n'{b}' + c)\n", kPy314), "t=read c=read");
  EXPECT_EQ(NamesOf("(t\\\n'{b}' + c)\n", kPy314), "t=read c=read");
}

TEST(Names, AnnotationsInStrings) {
  EXPECT_EQ(NamesOf("x: 'List[a.B]' = y\n"),
            "x=write/variable List=read+annotation+string a=read+annotation+string B=read+annotation+string<a y=read");
  EXPECT_EQ(NamesOf("def f(a: 'A', b='B') -> 'C': pass\n"),
            "f=definition/function a=definition/parameter@f A=read+annotation+string b=definition/parameter@f "
            "C=read+annotation+string");
  EXPECT_EQ(NamesOf("cast('A', b)\n"), "cast=call A=read+annotation+string b=read");
  EXPECT_EQ(NamesOf("x: Literal['a'] = 'b c'\n"), "x=write/variable Literal=read+annotation");
  EXPECT_EQ(NamesOf("x: 'A[\"B\", Literal[\"c\"]]'\n"),
            "x=definition/variable A=read+annotation+string B=read+annotation+string Literal=read+annotation+string");
  EXPECT_EQ(NamesOf("x: 'no type at all'\n"), "x=definition/variable");
}

TEST(Names, AnnotationsInComments) {
  EXPECT_EQ(NamesOf("x = []  # type: List[a.B]\n"),
            "x=write/variable List=read+annotation+comment a=read+annotation+comment B=read+annotation+comment<a");
  EXPECT_EQ(NamesOf("def f(a,  # type: A\n      b):\n  # type: (...) -> C\n  pass\n"),
            "f=definition/function a=definition/parameter@f A=read+annotation+comment b=definition/parameter@f "
            "C=read+annotation+comment");
  EXPECT_EQ(NamesOf("class K:\n  def f(self, a):  # type: (int) -> K\n    pass\n"),
            "K=definition/class f=definition/function@K self=definition/parameter@f a=definition/parameter@f "
            "int=read+annotation+comment@K^module K=read+annotation+comment@K^module");
  EXPECT_EQ(NamesOf("x = y  # type: A['B']\n"),
            "x=write/variable y=read A=read+annotation+comment B=read+annotation+comment+string");
  EXPECT_EQ(NamesOf("x = 1  # type: ignore[attr]\ny = 2  # type: the kind of thing\n"),
            "x=write/variable y=write/variable");
  EXPECT_EQ(NamesOf("f([x  # type: T\n for x in y])\n"),
            "f=call x=read@comprehension T=read+annotation+comment x=write/variable@comprehension y=read");
}

// ---- names in their normal form ----

TEST(Names, PrivateNamesAreSpelledAsTheyStand) {
  NameBinder binder(kPy312);
  const Bindings& bindings = binder.Bind("class _A:\n  __x = 1\n  def __f(self, __y__): return self.__x + __x\n");
  EXPECT_EQ(NamesOf(bindings),
            "_A=definition/class __x=write/variable@_A __f=definition/function@_A self=definition/parameter@__f "
            "__y__=definition/parameter@__f self=read@__f __x=read<self@__f __x=read@__f^module");
  EXPECT_EQ(SymbolsOf(bindings, 1), "_A__x:la _A__f:la");
  EXPECT_EQ(SymbolsOf(bindings, 2), "self:plr __y__:pl _A__x:gr");
  EXPECT_EQ(SymbolsOf(binder.Bind("class __:\n  __x = 1\n"), 1), "__x:la");
}

TEST(Names, PrivateNamesInFrontOfTheBodyOfAClass) {
  constexpr Text kSource = "class C[T: __p, __U](B[__U], __q): __r\n";
  NameBinder older(kPy312);
  EXPECT_EQ(SymbolsOf(older.Bind(kSource), 1), "T:las _C__U:lar B:gr _C__q:gr");
  EXPECT_EQ(SymbolsOf(older.Bind(kSource), 2), "_C__p:gr");
  NameBinder newer(Version::Of(3, 13));
  EXPECT_EQ(SymbolsOf(newer.Bind(kSource), 1), "T:las _C__U:lar B:gr __q:gr");
  EXPECT_EQ(SymbolsOf(newer.Bind(kSource), 2), "__p:gr");
  EXPECT_EQ(SymbolsOf(newer.Bind(kSource), 3), "_C__r:gr");
}

TEST(Names, NamesOfOneNormalFormAreOneSymbol) {
  SetNameNormalizer([](Text name, std::string& normal) {
    normal = name == "\xC2\xB5" ? "\xCE\xBC" : name;  // the micro sign is the Greek letter
    return true;
  });
  NameBinder binder(kPy312);
  const Bindings& bindings = binder.Bind("\xC2\xB5 = 1\n\xCE\xBC\n");
  SetNameNormalizer(nullptr);
  EXPECT_EQ(SymbolsOf(bindings, 0), "\xCE\xBC:glar");
  EXPECT_EQ(bindings.TextOf(bindings.occurrences[0]), "\xC2\xB5");
  EXPECT_EQ(bindings.VariableOf(bindings.occurrences[0]), bindings.VariableOf(bindings.occurrences[1]));
}

// ---- 2.7 and the versions in between ----

TEST(Names, Python2) {
  EXPECT_EQ(NamesOf("print >>f, a\nprint(b)\nexec c in d, e\n", kPy27), "f=read a=read b=read c=read d=read e=read");
  EXPECT_EQ(NamesOf("from __future__ import print_function\nprint(b)\n", kPy27),
            "__future__=import print_function=import/import print=call b=read");
  EXPECT_EQ(NamesOf("try: pass\nexcept E, e: raise F, v, t\nexcept (A, B), (c, d): pass\n", kPy27),
            "E=read e=write/variable F=read v=read t=read A=read B=read c=write/variable d=write/variable");
  EXPECT_EQ(NamesOf("def f(a, (b, (c, d))=e): pass\nlambda (x, y): x\n", kPy27),
            "f=definition/function a=definition/parameter@f b=definition/parameter@f c=definition/parameter@f "
            "d=definition/parameter@f e=read x=definition/parameter@lambda y=definition/parameter@lambda "
            "x=read@lambda");
  EXPECT_EQ(NamesOf("[x for x in y]\nset(x for x in y)\n", kPy27),
            "x=read x=write/variable y=read set=call x=read@comprehension x=write/variable@comprehension y=read");
  EXPECT_EQ(NamesOf("[x() for x in lambda: a, lambda: b if x()]\n", kPy27),
            "x=call x=write/variable a=read@lambda^module b=read@lambda^module x=call");
  EXPECT_EQ(NamesOf("x = `a.b` <> None\nasync = nonlocal\n", kPy27),
            "x=write/variable a=read b=read<a None=read async=write/variable nonlocal=read");
}

TEST(Names, AwaitIsANameInOlderVersions) {
  EXPECT_EQ(NamesOf("async = await\n", kPy36), "async=write/variable await=read");
  EXPECT_EQ(NamesOf("async def f():\n  await x\n  [a async for a in b]\n", kPy36),
            "f=definition/function x=read@f^module a=read@comprehension a=write/variable@comprehension "
            "b=read@f^module");
  EXPECT_EQ(NamesOf("await x\n"), "x=read");
}

TEST(Names, AnnotationsByVersion) {
  constexpr Text kSource = "from __future__ import annotations\nx: A\ndef f(a: B): c: D\n";
  const auto symbols_of = [&](Text source, Version version) {
    NameBinder binder(version);
    const Bindings& bindings = binder.Bind(source);
    std::string result;
    for (uint32_t scope = 0; scope < bindings.scopes.size(); ++scope)
      result.append(scope == 0 ? "" : " / ").append(SymbolsOf(bindings, scope));
    return result;
  };
  EXPECT_EQ(symbols_of(kSource, kPy38), "annotations:gli x:glat A:gr f:glas B:gr / a:pl c:lat D:gr");
  EXPECT_EQ(symbols_of(kSource, kPy312), "annotations:gli x:glat f:glas / a:pl c:lat");
  EXPECT_EQ(symbols_of("x: A\ndef f(a: B): c: D\n", kPy312), "x:glat A:gr f:glas B:gr / a:pl c:lat D:gr");
  // From 3.14 on they are evaluated when somebody asks, in scopes of their own.
  EXPECT_EQ(symbols_of("x: A\ndef f(a: B): c: D\n", kPy314), "x:glat f:glas / A:gr / a:pl c:lat / B:gr");
  EXPECT_EQ(NamesOf("class C:\n  x = 1\n  y: x\n  def f(a: x): a\n", kPy314),
            "C=definition/class x=write/variable@C y=definition/variable@C x=read+annotation@annotation^C "
            "f=definition/function@C a=definition/parameter@f x=read+annotation@annotation^C a=read@f");
}

// ---- the symbols of scopes ----

TEST(Names, FreeVariablesPassThroughTheScopesBetween) {
  NameBinder binder(kPy312);
  const Bindings& bindings = binder.Bind(
      "def f(x):\n"
      "  class C:\n"
      "    x = 1\n"
      "    def g():\n"
      "      def h(): return x\n");
  EXPECT_EQ(SymbolsOf(bindings, 1), "x:pl C:las");
  EXPECT_EQ(SymbolsOf(bindings, 2), "x:la g:las");
  EXPECT_EQ(SymbolsOf(bindings, 3), "h:las x:f");
  EXPECT_EQ(SymbolsOf(bindings, 4), "x:fr");
  const uint32_t read = static_cast<uint32_t>(bindings.occurrences.size()) - 1;
  EXPECT_EQ(OccurrenceWord(bindings, read), "x=read@h^f");
}

TEST(Names, SuperMentionsTheClass) {
  NameBinder binder(kPy312);
  const Bindings& bindings = binder.Bind("class A:\n  def f(self): super().f()\ndef g(): __class__\n");
  EXPECT_EQ(SymbolsOf(bindings, 1), "f:las");
  EXPECT_EQ(SymbolsOf(bindings, 2), "self:pl super:gr __class__:fr");
  EXPECT_EQ(SymbolsOf(bindings, 3), "__class__:gr");
}

TEST(Names, GlobalStatementsOfFunctionsMarkTheModule) {
  NameBinder binder(kPy312);
  const Bindings& bindings = binder.Bind("def f():\n  global x\n  def x(): pass\n");
  EXPECT_EQ(SymbolsOf(bindings, 0), "f:glas x:gd");
  EXPECT_EQ(SymbolsOf(bindings, 1), "x:gdas");
}

TEST(Names, OccurrencesOfSymbols) {
  NameBinder binder(kPy312);
  const Bindings& bindings = binder.Bind("x = 1\ndef f():\n  print(x)\nx\nprint(x)\n");
  const OccurrencesOfSymbols occurrences(bindings);
  const uint32_t x = bindings.VariableOf(bindings.occurrences[0]);
  const auto texts_of = [&](uint32_t symbol) {
    std::string words;
    for (const uint32_t index : occurrences.Of(symbol)) words.append(OccurrenceWord(bindings, index)).append(" ");
    return words;
  };
  EXPECT_EQ(texts_of(x), "x=write/variable x=read@f^module x=read x=read ");
  // A symbol of the function's own has what stands in the function.
  EXPECT_EQ(texts_of(bindings.occurrences[3].place), "x=read@f^module ");
  // Nobody defines `print`; its uses have one owner all the same.
  EXPECT_EQ(texts_of(bindings.VariableOf(bindings.occurrences[2])), "print=call@f^module print=call ");
}

TEST(Names, ScopesKnowTheirPlace) {
  NameBinder binder(kPy312);
  const Bindings& bindings =
      binder.Bind("@d\nclass A:\n  def f(self):\n    return [x\n      for x in y]\n\n# end\nz\n");
  const auto lines = [&](uint32_t scope) {
    return std::pair(bindings.PositionOf(bindings.scopes[scope].begin).line + 1,
                     bindings.PositionOf(bindings.scopes[scope].end).line + 1);
  };
  EXPECT_EQ(lines(0), std::pair(1, 9));
  EXPECT_EQ(lines(1), std::pair(2, 5));
  EXPECT_EQ(lines(2), std::pair(3, 5));
  EXPECT_EQ(lines(3), std::pair(4, 5));
}

// ---- broken code ----

TEST(BrokenNames, AWordOfTheLanguageIsNoNameWhereverItStands) {
  EXPECT_EQ(NamesOf("x = nonlocal + y\n"), "x=write/variable y=read");
  EXPECT_EQ(NamesOf("x = nonlocal + y\n", kPy27), "x=write/variable nonlocal=read y=read");
}

TEST(BrokenNames, ADefinitionWithoutParametersMayReturnAType) {
  EXPECT_EQ(NamesOf("def f -> 'A': pass\n"), "f=definition/function A=read+annotation+string");
}

TEST(BrokenNames, DefinitionsKeepTheirScope) {
  EXPECT_EQ(NamesOf("class A:\n  def add(self, item, count=1)\n    self.items(item)\n  x = 1\n"),
            "A=definition/class add=definition/function@A self=definition/parameter@add item=definition/parameter@add "
            "count=definition/parameter@add self=read@add items=call<self@add item=read@add x=write/variable@A");
  EXPECT_EQ(NamesOf("def f a, b:\n  a\n"),
            "f=definition/function a=definition/parameter@f b=definition/parameter@f a=read@f");
  EXPECT_EQ(NamesOf("def f(a, b.c, d e):\n  a\n"),
            "f=definition/function a=definition/parameter@f b=definition/parameter@f c=read<b "
            "d=definition/parameter@f e=definition/parameter@f a=read@f");
  EXPECT_EQ(NamesOf("class (B):\n  x = 1\n"), "B=read+base x=write/variable@?");
  EXPECT_EQ(NamesOf("def\nclass\ndef class x\n"), "x=definition/class@?");
  EXPECT_EQ(NamesOf("public def f(a):\n  a\n"), "public=read f=definition/function a=definition/parameter@f a=read@f");
}

TEST(BrokenNames, TheBestRoleThatTokensAllow) {
  EXPECT_EQ(NamesOf("f(a.b(c = \nx = 1\n"), "f=call a=read b=call<a c=keyword x=write/variable");
  EXPECT_EQ(NamesOf("if x = 3:\n"), "x=write/variable");
  EXPECT_EQ(NamesOf("a b = c d\n"), "a=write/variable b=write/variable c=read d=read");
  EXPECT_EQ(NamesOf("x = = y.\n"), "x=write/variable y=read");
  EXPECT_EQ(NamesOf(".a.b\n"), "a=read< b=read<a");
  EXPECT_EQ(NamesOf(") a ] b = c\n"), "a=write/variable b=write/variable c=read");
  EXPECT_EQ(NamesOf("for in x: y\nfor a b: c\n"), "x=read y=read a=write/variable b=write/variable c=read");
  EXPECT_EQ(NamesOf("import a. as b c\nfrom x impor y\n"),
            "a=import b=definition/import c=import/import x=import impor=import y=import");
  EXPECT_EQ(NamesOf("global x = y\n"), "x=declaration y=read");
  EXPECT_EQ(NamesOf("lambda x\nlambda: \n(lambda x, y=\n"),
            "x=definition/parameter@lambda x=definition/parameter@lambda y=definition/parameter@lambda");
  EXPECT_EQ(NamesOf("[x for x\n"), "x=read@comprehension x=write/variable@comprehension");
  EXPECT_EQ(NamesOf("with a as\ndel\nreturn return x\n"), "a=read x=read");
  EXPECT_EQ(NamesOf("del a, b = c, d\n"), "a=delete b=write/variable c=delete d=delete");
  EXPECT_EQ(NamesOf("del (a) = b\ndel a.b = c\n"), "a=write/variable b=delete a=read b=write<a c=delete");
  EXPECT_EQ(NamesOf("del a as b = c\n"), "a=delete b=write/variable c=delete");
}

TEST(BrokenNames, WhatIsAroundStaysAsItIs) {
  EXPECT_EQ(NamesOf("def f(x:\n  y\ndef g(): x\n"),
            "f=definition/function x=definition/parameter@f y=read@f^module g=definition/function x=read@g^module");
  // A bracket that is left open swallows lines; a definition at the beginning of one tells so.
  EXPECT_EQ(NamesOf("class B(\n  def kept(self): pass\n  x = (1,\n   y)\nz\n"),
            "B=definition/class kept=definition/function@B self=definition/parameter@kept x=write/variable@B "
            "y=read@B^module z=read");
  EXPECT_EQ(NamesOf("class B(A:\n  async def kept(self,\n  def other(self): self\nclass C: pass\n"),
            "B=definition/class A=read+base kept=definition/function@B self=definition/parameter@kept "
            "other=definition/function@B self=definition/parameter@other self=read@other C=definition/class");
  EXPECT_EQ(NamesOf("f(x, [y\n  class A:\n    z\n"), "f=call x=read y=read A=definition/class z=read@A^module");
  EXPECT_EQ(NamesOf("def f(x):\n  y = (x\n  return y\n"),
            "f=definition/function x=definition/parameter@f y=write/variable@f x=read@f y=read@f");
}

}  // namespace
}  // namespace quillet::testing
