// What expressions are: small programs and the types at their marked places.
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "tests/core/support/program.h"

namespace quillet {
namespace {

using testing::Program;

struct Case {
  const char* text;
  std::vector<std::string> types;  // at each mark; without "builtins."
};

std::string WithoutBuiltins(std::string type) {
  for (size_t at = type.find("builtins."); at != std::string::npos; at = type.find("builtins.", at)) type.erase(at, 9);
  return type;
}

void Check(std::initializer_list<Case> cases, Version version = Version::Of(3, 12)) {
  for (const Case& one : cases) {
    Program program(one.text, version);
    std::vector<std::string> types = program.AllTypes();
    for (std::string& type : types) type = WithoutBuiltins(type);
    EXPECT_EQ(types, one.types) << one.text;
  }
}

TEST(Inference, ReadsLiterals) {
  Check({
      {"$a = 1\n$b = 1.5\n$c = 2j\n$d = 'x'\n$e = b'x'\n$f = True\n$g = None\n$h = ...\n$i = f'{a}'\n",
       {"int", "float", "complex", "str", "bytes", "bool", "None", "types.EllipsisType", "str"}},
      {"$a = [1, 2]\n$b = {1}\n$c = {'a': 1}\n$d = 1, 'a'\n$e = ()\n$f = []\n$g = [1, 'a']\n",
       {"list[int]", "set[int]", "dict[str, int]", "tuple[int, str]", "tuple[()]", "list", "list[int | str]"}},
      {"$a = 'x' 'y'\n$b = b'x' b'y'\n$c = u'x'\n$d = r'x'\n", {"str", "bytes", "str", "str"}},
      {"a = [1]\n$b = [*a, 'x']\nc = {'a': 1}\n$d = {**c, 'b': 'x'}\n$e = (*a, 'x')\n",
       {"list[int | str]", "dict[str, int | str]", "tuple[int | str]"}},
      {"$a = lambda: 1\n$b = (lambda x: x)(1)\n", {"def () -> int", "int"}},
  });
}

TEST(Inference, KnowsWhatOperatorsGive) {
  Check({
      {"$a = 1 + 2\n$b = 1 / 2\n$c = 1 + 1.5\n$d = -1\n$e = not 1\n$f = 1 < 2\n$g = 'a' + 'b'\n$h = 'a' % 1\n",
       {"int", "float", "float", "int", "bool", "bool", "str", "str"}},
      {"$a = 1 is None\n$b = 'a' in 'ab'\n$c = 'a' * 2\n$d = [1] + ['a']\n",
       {"bool", "bool", "str", "list[int | str]"}},
      {"class A:\n  def __add__(self, other): return 'x'\n  def __radd__(self, other): return b'x'\n"
       "  def __neg__(self): return 1\n  def __getitem__(self, i): return 1.5\n  def __lt__(self, other): return [1]\n"
       "  def __iadd__(self, other): return 1\n"
       "a = A()\n$b = a + 1\n$c = 1 + a\n$d = -a\n$e = a[0]\n$f = a < a\na += 1\n$a\n",
       {"str", "bytes", "int", "float", "list[int]", "int"}},
      {"def f(a: int, b: str, c: int | None):\n  $x = a and b\n  $y = a or b\n  $z = c or b\n  $w = a if b else b\n",
       {"int | str", "int | str", "int | str", "int | str"}},
      {"$a = None or 1\n$b = [] and 1\n", {"int", "int | list"}},
  });
}

TEST(Inference, FollowsCallsToWhatTheyReturn) {
  Check({
      {"def f(): return 1\n$a = f()\n$b = f\n", {"int", "def () -> int"}},
      {"def f(x):\n  if x: return 1\n  return 'a'\n$a = f(z)\n$b = f(0)\n", {"int | str", "str"}},
      {"def f(): pass\n$a = f()\n", {"None"}},
      {"def f(): raise E\n$a = f()\n", {""}},
      {"def f(x): return x\n$a = f(1)\n$b = f('a')\n", {"int", "str"}},
      {"def f(x, y=2, *z, w='a', **k): return x, y, z, w, k\n$a = f(b'', 1.5, None, w=3, v=4)\n",
       {"tuple[bytes, float, tuple[None], int, dict[str, int]]"}},
      {"def f(x, y): return y\n$a = f(y=1, x='a')\n$b = f(*('a', 1))\n$c = f(**{'y': 1, 'x': 'a'})\n",
       {"int", "int", "int"}},
      {"def f(g): return g(1)\n$a = f(lambda x: [x])\n$b = f(str)\n", {"list[int]", "str"}},
      {"def f() -> 'int': return g()\n$a = f()\n", {"int"}},
      {"class A:\n  def __call__(self): return 1\n$a = A()()\n", {"int"}},
      {"def f():\n  def g(): return 1\n  return g\n$a = f()()\n", {"int"}},
      {"def f(x):\n  def g(): return x\n  return g\n$a = f('a')()\n$b = f(1)()\n", {"str", "int"}},
      {"def f(n):\n  if n: return f(n - 1)\n  return 1\n$a = f(3)\n", {"int"}},
      {"def f(n): return g(n)\ndef g(n): return f(n)\n$a = f(3)\n", {""}},
  });
}

TEST(Inference, GuessesWhatAClassLeavesToThoseBelow) {
  Check({
      {"class A:\n  def m(self): raise NotImplementedError\n  def n(self): return self.$x\n"
       "class B(A):\n  x = 1\n  def m(self): return 'a'\nclass C(B):\n  def m(self): return 1.5\n"
       "def f(a: A):\n  $b = a.m()\n  $c = a.n()\n",
       {"int", "str", "int"}},
      {"class A:\n  def m(self): raise NotImplementedError\nclass B(A): pass\ndef f(a: A):\n  $b = a.m()\n", {""}},
      {"class A:\n  def m(self): raise NotImplementedError\nclass B:\n  def m(self): return 1\n"
       "def f(a: A):\n  $b = a.m()\n",
       {""}},
      // That of another class of the same name.
      {"class A:\n  def m(self): raise NotImplementedError\nclass C:\n  class A: pass\n  class B(A):\n"
       "    def m(self): return 1\ndef f(a: A):\n  $b = a.m()\n",
       {""}},
  });
}

TEST(Inference, KnowsWhatAClauseHasBoundInFrontOfTheNext) {
  Check({
      {"def f(a):\n  y = 'a'\n  [0 for x in (y := [1]) for z in $y]\n  [0 for x in a if (y := 1.5) for z in $y]\n  "
       "$y\n",
       {"list[int]", "float", "float | list[int] | str"}},
  });
}

TEST(Inference, TakesNoConditionFromAnotherStatement) {
  Check({
      {"if :\n  False\n  $x = 1\n  $x\n$x\n", {"int", "int", "int"}},
      {"if a: $x = 'a'\nelif :\n  False\n  $x = 1\n$x\n", {"str", "int", "int | str"}},
  });
}

TEST(Inference, MakesOfADecoratorNoMoreThanOfACall) {
  Check({
      {"from typing import TypeVar, NamedTuple\nfrom enum import Enum\n@TypeVar\ndef f(a): pass\n$f\n@NamedTuple\n"
       "def g(a): pass\n$g\n@Enum\ndef h(a): pass\n$h\n@namedtuple\ndef i(a): pass\n$i\n",
       {"typing.TypeVar", "typing.NamedTuple", "enum.Enum", "def (a) -> None"}},
  });
}

TEST(Inference, KnowsAttributesOfInstances) {
  Check({
      {"class A:\n  def __init__(self):\n    self.x = 1\n  def m(self):\n    self.y = 'a'\n    $self.x\n"
       "a = A()\na.$x\na.$y\na.$m\n$a\n",
       {"a.A", "int", "str", "def () -> None", "a.A"}},
      {"class A:\n  x = 1\n  def __init__(self):\n    self.x = 'a'\na = A()\na.$x\nA.$x\n", {"int | str", "int"}},
      {"class A:\n  x: int = None\n  y: 'str'\nA().$x\nA().$y\n", {"int", "str"}},
      {"class A:\n  def __init__(self, x): self.x = x\nA(1).$x\n", {"int"}},
      {"class A:\n  def m(self): return self\nclass B(A): pass\nB().$m()\n$b = B().m()\n", {"def () -> a.A", "a.B"}},
      {"class A:\n  class B:\n    x = 1\n$a = A.B()\nA.B.$x\n", {"a.A.B", "int"}},
      {"class A:\n  def m(self): return 1\n$a = A.m\n$b = A().m\n", {"def (self) -> int", "def () -> int"}},
      {"class A: pass\n$a = A\n$b = A()\nb.$__class__\n", {"type[a.A]", "a.A", "type[a.A]"}},
  });
}

TEST(Inference, CallsPropertiesAndDescriptors) {
  Check({
      {"class A:\n  @property\n  def p(self): return 1\n  @p.setter\n  def p(self, value): pass\n"
       "a = A()\na.$p\nA.$p\n",
       {"int", "property"}},
      {"class A:\n  def get(self): return 1\n  p = property(get)\nA().$p\n", {"int"}},
      {"class D:\n  def __get__(self, instance, owner): return 1\nclass A:\n  d = D()\nA().$d\nA.$d\n", {"int", "int"}},
      {"from functools import cached_property\nclass A:\n  @cached_property\n  def p(self): return 'a'\nA().$p\n",
       {"str"}},
      {"class D:\n  def __get__(self, instance: None, owner) -> int: ...\nclass A:\n  def __init__(self):\n"
       "    self.d = D()\nA().$d\n",
       {"a.D"}},
  });
}

TEST(Inference, TellsStaticAndClassMethodsApart) {
  Check({
      {"class A:\n  @staticmethod\n  def s(x): return x\n  @classmethod\n  def c(cls): return cls()\n"
       "  @classmethod\n  def d(cls):\n    $cls\n    return cls\nclass B(A): pass\n"
       "$a = A.s(1)\n$b = A().s('a')\n$c = B.c()\n$d = B().c()\n$e = B.d()\n",
       {"type[a.A]", "int", "str", "a.B", "a.B", "type[a.B]"}},
      {"class A:\n  def __new__(cls, x): return super().__new__(cls)\n$a = A(1)\n", {"a.A"}},
      {"class A:\n  def __new__(cls): return 1\n$a = A()\n", {"int"}},
      {"class A:\n  def f(x): return x\n  def g(cls): return cls()\n  f = staticmethod(f)\n  g = classmethod(g)\n"
       "class B(A): pass\n$a = A().f(1)\n$b = A.f('a')\n$c = B.g()\n$d = B().g()\n",
       {"int", "str", "a.B", "a.B"}},
      {"class M(type):\n  def m(cls): return 1\nclass A(metaclass=M): pass\n$a = A.m()\n", {"int"}},
      {"class M(type):\n  def __call__(cls): return 1\nclass A(metaclass=M): pass\n$a = A()\n", {"int"}},
      {"class A:\n  def __init_subclass__(cls): $cls\n", {"type[a.A]"}},
  });
}

TEST(Inference, GoesToBasesBySuper) {
  Check({
      {"class A:\n  def m(self): return 1\nclass B(A):\n  def m(self):\n    return $super().m(), 'a'\n$b = B().m()\n",
       {"type[super]", "tuple[int, str]"}},
      {"class A:\n  def m(self): return 1\nclass B(A):\n  def m(self):\n    $x = super(B, self).m()\n", {"int"}},
      {"class A:\n  @classmethod\n  def c(cls): return cls()\nclass B(A):\n  @classmethod\n  def c(cls):\n"
       "    return super().c()\n$b = B.c()\n",
       {"a.B"}},
      {"class A:\n  def m(self): return 1\nclass B(A):\n  def m(self): return 'a'\nclass C(A):\n"
       "  def m(self): return super().m()\nclass D(C, B): pass\n$c = C().m()\n$d = D().m()\n",
       {"int", "str"}},
      {"class A:\n  def m(self): return 1\nclass B(A):\n  def m(self): return 'a'\n  def n(self):\n"
       "    $x = super().m()\n    $y = self.m()\n",
       {"int", "str"}},
  });
}

TEST(Inference, OrdersBasesByC3) {
  Check({
      {"class A: x = 1\nclass B(A): pass\nclass C(A): x = 'a'\nclass D(B, C): pass\nD.$x\n", {"str"}},
      {"class A: x = 1\nclass B(A): x = b''\nclass C(A): x = 'a'\nclass D(B, C): pass\nD.$x\n", {"bytes"}},
      {"class O: pass\nclass A(O): pass\nclass B(O): x = 1\nclass C(A, B): pass\nC().$x\n", {"int"}},
      {"from nowhere import U\nclass A: x = 1\nclass B(A, U): pass\nclass C(U, A): pass\nB().$x\nC().$x\n",
       {"int", "int"}},
      {"class A(A): x = 1\nA.$x\nclass B(C): y = 1\nclass C(B): z = 'a'\nC.$y\nB.$y\n", {"int", "int", "int"}},
      {"class A: x = 1\nclass B(A): pass\nclass C(A, B): pass\nC.$x\n", {"int"}},
  });
}

TEST(Inference, SolvesGenerics) {
  Check({
      {"from typing import TypeVar\nT = TypeVar('T')\ndef f(x: T, y: list[T]) -> dict[str, T]: ...\n$a = f(1, [2])\n",
       {"dict[str, int]"}},
      {"def f[T](x: T) -> list[T]: ...\n$a = f('a')\n", {"list[str]"}},
      {"from typing import Generic, TypeVar\nT = TypeVar('T')\nclass Box(Generic[T]):\n"
       "  def __init__(self, item: T): self.item = item\n  def get(self) -> T: return self.item\n"
       "$a = Box(1)\n$b = Box('a').get()\nBox(b'').$item\ndef f(x: Box[float]):\n  x.$item\n  $y = x.get()\n",
       {"a.Box[int]", "str", "bytes", "float", "float"}},
      {"class Box[T]:\n  def get(self) -> T: ...\nclass Sub(Box[int]): pass\nclass More[U](Box[list[U]]): pass\n"
       "$a = Sub().get()\ndef f(x: More[str]):\n  $y = x.get()\n",
       {"int", "list[str]"}},
      {"from typing import Self\nclass A:\n  def m(self) -> Self: ...\n  @classmethod\n  def c(cls) -> Self: ...\n"
       "class B(A): pass\n$a = B().m()\n$b = B.c()\n",
       {"a.B", "a.B"}},
      {"from typing import overload\n@overload\ndef f(x: int) -> str: ...\n@overload\ndef f(x: str) -> int: ...\n"
       "def f(x): return x\n$a = f(1)\n$b = f('a')\n",
       {"str", "int"}},
      {"d = {'a': [1]}\n$a = d.items()\n$b = d.get('b')\n$c = d.get('b', [2])\n$e = d['a'][0]\n",
       {"dict_items[str, list[int]]", "None | list[int]", "list[int]", "int"}},
      {"$a = sorted({'a': 1})\n$b = max([1.5])\n$c = next(iter([b'']))\n$d = list(map(len, ['a']))\n"
       "$e = list(zip([1], ['a']))\n$f = dict({1: 'a'})\n",
       {"list[str]", "float", "bytes", "list[int]", "list[tuple[int, str]]", "dict[int, str]"}},
      {"from typing import Callable, TypeVar\nT = TypeVar('T')\ndef f(g: Callable[[], T]) -> T: ...\n"
       "$a = f(lambda: 1)\nclass A: pass\n$b = f(A)\n",
       {"int", "a.A"}},
      {"def f(x: type[int], y: 'list[str]'):\n  $a = x()\n  $b = y[0]\n  $c = y[1:]\n", {"int", "str", "list[str]"}},
  });
}

TEST(Inference, UnpacksAndIterates) {
  Check({
      {"$a, $b = 1, 'a'\n($c, [$d, $e]) = 1, ('a', b'')\n", {"int", "str", "int", "str", "bytes"}},
      {"$a, *$b, $c = 1, 'a', 'b', 1.5\n*$d, $e = [1, 2]\n", {"int", "list[str]", "float", "list[int]", "int"}},
      {"for $a in [1]: pass\nfor $b in 'ab': pass\nfor $c, $d in {'a': 1}.items(): pass\nfor $e in {1: 2}: pass\n",
       {"int", "str", "str", "int", "int"}},
      {"for $i, $x in enumerate(['a']): pass\nfor $a, $b in zip([1], [b'']): pass\nfor $c in range(3): pass\n",
       {"int", "str", "int", "bytes", "int"}},
      {"for $a in (1, 'a'): pass\nfor $b in (1,) + (2,): pass\n", {"int | str", "int"}},
      {"class A:\n  def __iter__(self): return self\n  def __next__(self): return 1\nfor $a in A(): pass\n"
       "[$b, $c] = A()\n",
       {"int", "int", "int"}},
      {"class A:\n  def __getitem__(self, i): return 'a'\nfor $a in A(): pass\n", {"str"}},
      {"t = 1, 'a', b''\n$a = t[0]\n$b = t[-1]\n$c = t[g()]\n", {"int", "bytes", "bytes | int | str"}},
      {"d = {'a': 1, 'b': 'x'}\n$a = d['a']\n$b = d['b']\n", {"int", "str"}},
      {"a = []\na.append(1)\nfor $x in a: pass\n", {"int"}},
      {"x = [1, 2]\nx[$i], y = 1, 2\n", {""}},
  });
}

TEST(Inference, EntersManagersAndCatchesErrors) {
  Check({
      {"class A:\n  def __enter__(self): return 1\n  def __exit__(self, *a): pass\nwith A() as $a: pass\n"
       "with A() as b, A() as $c: pass\n",
       {"int", "int"}},
      {"class A:\n  def __enter__(self): return 1, 'a'\nwith A() as ($a, $b): pass\n", {"int", "str"}},
      {"class A:\n  async def __aenter__(self): return 1\nasync def f():\n  async with A() as $a: pass\n", {"int"}},
      {"from contextlib import contextmanager\n@contextmanager\ndef f():\n  yield 'a'\nwith f() as $a: pass\n",
       {"str"}},
      {"try: pass\nexcept ValueError as $e: pass\nexcept (KeyError, OSError) as $f:\n  f.$errno\n",
       {"ValueError", "KeyError | OSError", "None | int"}},
      {"class E(Exception):\n  def __init__(self, x): self.x = x\ntry: pass\nexcept E as e:\n  $e.x\n", {"a.E"}},
      {"es = (ValueError, KeyError)\ntry: pass\nexcept es as $e: pass\n", {"KeyError | ValueError"}},
      {"try: pass\nexcept* ValueError as $e: pass\n", {"ExceptionGroup[ValueError]"}},
      {"try: pass\nexcept 'x' as $e: pass\n", {""}},
      {"class A:\n  def __iter__(self): yield A()\ntry: pass\nexcept A() as $e: pass\n", {""}},
  });
}

TEST(Inference, ReadsComprehensionsAndLambdas) {
  Check({
      {"$a = [x for x in [1]]\n$b = {x for x in 'a'}\n$c = {k: v for k, v in [(1, 'a')]}\n"
       "$d = (x for x in [1])\n$e = [($y, z) for y in [1] for z in [y]]\n",
       {"list[int]", "set[str]", "dict[int, str]", "typing.Generator[int, None, None]", "list[tuple[int, int]]",
        "int"}},
      {"for $x in (str(i) for i in [1]): pass\n", {"str"}},
      {"f = lambda x, y=1: (x, y)\n$a = f('a')\n", {"tuple[str, int]"}},
      {"$a = [x for x in [1, None] if x is not None]\n", {"list[int]"}},
      {"$a = [y := 1 for _ in 'a']\n$b = y\nif ($z := 'a'): pass\n", {"list[int]", "int", "str"}},
  });
}

TEST(Inference, LooksThroughDecorators) {
  Check({
      {"from functools import wraps\ndef d(f):\n  @wraps(f)\n  def w(*args, **kw): return f(*args, **kw)\n  return w\n"
       "@d\ndef f(x): return 1\n$a = f(2)\n",
       {"int"}},
      {"def d(f): return f\n@d\ndef f(): return 1\n$a = f()\n", {"int"}},
      {"def d(n):\n  def e(f): return f\n  return e\n@d(1)\ndef f(): return 'a'\n$a = f()\n", {"str"}},
      {"def d(f): return 1\n@d\ndef f(): pass\n$a = f\n", {"int"}},
      {"def d(c):\n  c.x = 1\n  return c\n@d\nclass A: pass\n$a = A()\n", {"a.A"}},
      {"class D:\n  def __init__(self, f): self.f = f\n  def __call__(self): return 1\n@D\ndef f(): pass\n$a = f()\n"
       "$f\n",
       {"int", "a.D"}},
      {"from nowhere import d\n@d\ndef f(): return 1\n$a = f()\n", {"int"}},
      // What a decorator says that it makes of a method takes the receiver first, too.
      {"from typing import Any, Callable\ndef d(f) -> Callable[[Any, int], str]: ...\n"
       "class A:\n  @d\n  def m(self, x): pass\n$a = A().m\n$b = A.m\n$c = A().m(1)\n",
       {"def (int) -> str", "def (typing.Any, int) -> str", "str"}},
  });
}

TEST(Inference, KnowsDataclasses) {
  Check({
      {"from dataclasses import dataclass, field\n@dataclass\nclass A:\n  x: int\n  y: str = 'a'\n"
       "  z: list[int] = field(default_factory=list)\na = A(1)\na.$x\na.$y\na.$z\n",
       {"int", "str", "list[int]"}},
      {"import dataclasses\n@dataclasses.dataclass(frozen=True)\nclass A[T]:\n  x: T\n$a = A(1)\na.$x\n",
       {"a.A[int]", "int"}},
  });
}

TEST(Inference, KnowsNamedTuplesTypedDictsAndEnums) {
  Check({
      {"from typing import NamedTuple\nclass P(NamedTuple):\n  x: int\n  y: str = ''\n  def m(self): return self.x\n"
       "p = P(1)\np.$x\n$a, $b = p\n$c = p[1]\n$d = p.m()\n$p\n",
       {"int", "int", "str", "str", "int", "a.P"}},
      {"from collections import namedtuple\nP = namedtuple('P', 'x y')\n$p = P(1, 'a')\n$q = p._asdict()\n",
       {"a.P", "dict[str, typing.Any]"}},
      {"from typing import NamedTuple\nP = NamedTuple('P', [('x', int), ('y', str)])\nP(1, 'a').$y\n", {"str"}},
      {"from typing import TypedDict\nclass D(TypedDict):\n  x: int\n  y: 'str'\ndef f(d: D):\n  $a = d['x']\n"
       "  $b = d['y']\n  $c = d.copy()\n",
       {"int", "str", "a.D"}},
      {"from enum import Enum\nclass C(Enum):\n  RED = 1\n  BLUE = 'b'\n  def m(self): return self.value\n"
       "$a = C.RED\nC.RED.$name\nC.RED.$value\nC.BLUE.$value\nfor $c in C: pass\n$d = C['RED']\n$e = C(1)\n",
       {"a.C", "str", "int", "str", "a.C", "a.C", "a.C"}},
  });
}

TEST(Inference, FollowsConditionsOfWhatACallHandsOver) {
  Check({
      {"def f(a, b):\n  if a is None or b is None: return 1\n  return 'a'\n$x = f(0, None)\n$y = f(0, 0)\n$z = f(None, "
       "0)\n",
       {"int", "str", "int"}},
      {"def f(a, b):\n  if a is None and b is None: return 1\n  return 'a'\n$x = f(None, None)\n$y = f(None, 0)\n",
       {"int", "str"}},
      {"def f(a, b):\n  if not (a is None and not b is None): return 1\n  return 'a'\n$x = f(None, 0)\n$y = f(0, 0)\n",
       {"str", "int"}},
  });
}

TEST(Inference, TakesWhatHasTheMembersForAProtocolAlone) {
  // The first overload that takes the argument says what the call gives.
  const std::string head =
      "from typing import Any, NamedTuple, Protocol, TypedDict, overload\n"
      "class P(Protocol):\n  def m(self) -> int: ...\n"
      "class N(NamedTuple):\n  def m(self) -> int: ...\n"
      "class D(TypedDict):\n  def m(self) -> int: ...\n"
      "class A:\n  def m(self) -> int: return 1\nclass B: pass\n";
  for (const auto& [name, given] : {std::pair("P", "int"), std::pair("N", "str"), std::pair("D", "str")}) {
    const std::string text = head + "@overload\ndef f(x: " + name +
                             ") -> int: ...\n@overload\ndef f(x: object) -> str: ...\ndef f(x): ...\n"
                             "$a = f(A())\n$b = f(B())\n";
    Check({{text.c_str(), {given, "str"}}});
  }
}

TEST(Inference, NarrowsByConditions) {
  Check({
      {"def f(x: int | None):\n  if x is None:\n    $x\n  else:\n    $x\n  if x is not None:\n    $x\n  $x\n",
       {"None", "int", "int", "None | int"}},
      {"def f(x: int | None):\n  if x:\n    $x\n  if not x:\n    $x\n", {"int", "None | int"}},
      {"def f(x: int | None):\n  if x is None:\n    return\n  $x\n", {"int"}},
      {"def f(x: int | None):\n  if x is None:\n    raise ValueError\n  $x\n", {"int"}},
      {"def f(x: int | None):\n  assert x is not None\n  $x\n", {"int"}},
      {"def f(x: int | str | None):\n  if isinstance(x, int):\n    $x\n  elif isinstance(x, str):\n    $x\n  else:\n"
       "    $x\n",
       {"int", "str", "None"}},
      {"def f(x: int | str | bytes):\n  if isinstance(x, (int, str)):\n    $x\n  else:\n    $x\n",
       {"int | str", "bytes"}},
      {"def f(x: int | str | bytes):\n  if isinstance(x, int) or isinstance(x, str):\n    $x\n  else:\n    $x\n",
       {"int | str", "bytes"}},
      {"def f(x: int | None, y):\n  $a = x is not None and $x\n  if y and x is not None:\n    $x\n",
       {"bool | int", "int", "int"}},
      {"def f(x: int | None):\n  $a = x if x is not None else 0\n", {"int"}},
      {"def f(x: int | None):\n  while x is None:\n    $x\n  $x\n", {"None", "int"}},
      {"class A:\n  x: 'int | None'\n  def m(self):\n    if self.x is not None:\n      self.$x\n    self.$x\n",
       {"int", "None | int"}},
      {"def f(x):\n  if isinstance(x, str):\n    $x\n", {"str"}},
      {"def f(x: int | str):\n  if type(x) is int:\n    $x\n  else:\n    $x\n", {"int", "int | str"}},
      {"class A: pass\nclass B(A): pass\ndef f(x: A):\n  if isinstance(x, B):\n    $x\n  else:\n    $x\n",
       {"a.B", "a.A"}},
      {"def f(x: type[int] | None):\n  if x is None: return\n  $x\n", {"type[int]"}},
      {"def f(x: int | str):\n  match x:\n    case int():\n      $x\n    case str() as $y: pass\n", {"int", "str"}},
      {"def f(x: int | None):\n  if (y := x) is not None:\n    $y\n", {"int"}},
      {"from typing import TypeGuard\ndef g(x) -> TypeGuard[int]: ...\ndef f(x):\n  if g(x):\n    $x\n", {"int"}},
      {"def f(x: int | None):\n  if x == None:\n    return 1\n  $x\n", {"int"}},
  });
}

TEST(Inference, ReadsPatterns) {
  Check({
      {"match (1, 'a'):\n  case ($x, $y): pass\n", {"int", "str"}},
      {"match [1]:\n  case [$x, *$y]: pass\n", {"int", "list[int]"}},
      {"match {'a': 1}:\n  case {'a': $x, **$rest}: pass\n", {"int", "dict[str, int]"}},
      {"class P:\n  __match_args__ = ('x',)\n  def __init__(self):\n    self.x = 1\n    self.y = 'a'\n"
       "def f(p):\n  match p:\n    case P($x, y=$y): pass\n",
       {"int", "str"}},
      {"def f(x):\n  match x:\n    case str() | int() as $y: pass\n", {"int | str"}},
      {"match (1, 'a'):\n  case (1 as $x, _ as $y): pass\n", {"int", "str"}},
      {"match (1, 'a'):\n  case ((1 | ($x | 2)) as $y, _) | [$z]: pass\n", {"int", "int", "int"}},
  });
}

TEST(Inference, AwaitsAndGenerates) {
  Check({
      {"async def f(): return 1\nasync def g():\n  $a = await f()\n  $b = f()\n",
       {"int", "typing.Coroutine[typing.Any, typing.Any, int]"}},
      {"def f():\n  x = yield 1\n  return 'a'\n$a = f()\nfor $b in f(): pass\ndef g():\n  $c = yield from f()\n",
       {"typing.Generator[int, typing.Any, str]", "int", "str"}},
      {"async def f():\n  yield 1\nasync def g():\n  async for $x in f(): pass\n  $y = [z async for z in f()]\n",
       {"int", "list[int]"}},
      {"class A:\n  def __await__(self):\n    yield\n    return 1\nasync def f():\n  $a = await A()\n", {"int"}},
      {"from typing import Iterator\ndef f() -> Iterator[int]:\n  yield 1\nfor $a in f(): pass\n", {"int"}},
      {"async def f() -> int: ...\nasync def g():\n  $a = await f()\n", {"int"}},
      {"def f():\n  yield from [1]\nfor $a in f(): pass\n", {"int"}},
  });
}

TEST(Inference, ReadsAnnotationsAndTypeComments) {
  Check({
      {"def f(x, y):\n  # type: (int, str) -> bytes\n  $x\n  $y\n$a = f(1, 'a')\n", {"int", "str", "bytes"}},
      {"def f(x,  # type: int\n      y,  # type: str\n      ):\n  # type: (...) -> bytes\n  $x\n  $y\n",
       {"int", "str"}},
      {"class A:\n  def m(self, x):\n    # type: (int) -> str\n    $x\n$a = A().m(1)\n", {"int", "str"}},
      {"x = g()  # type: int\n$x\n", {"int"}},
      {"for x in g():  # type: int\n  $x\nwith g() as y:  # type: str\n  $y\n", {"int", "str"}},
      {"x: int = g()\n$x\ny: 'list[A]'\n$y\nclass A: pass\n", {"int", "list[a.A]"}},
      {"from typing import Optional, Union, List, Dict, Tuple\ndef f(a: Optional[int], b: Union[int, str], c: "
       "List[int],"
       " d: Dict[str, int], e: Tuple[int, ...]):\n  $a; $b; $c; $d; $e\n",
       {"None | int", "int | str", "list[int]", "dict[str, int]", "tuple[int]"}},
      {"from typing import Literal, Final, ClassVar, Annotated, Any\na: Final = 1\n$a\nclass A:\n  x: ClassVar[int]\n"
       "A.$x\ndef f(m: Literal['a', 1], n: Annotated[str, 1], o: Any):\n  $m; $n; $o\n",
       {"int", "int", "int | str", "str", ""}},
      {"from typing import Callable\ndef f(g: Callable[[int], str], *args: int, **kw: str):\n  $a = g(1)\n  $args\n"
       "  $kw\n",
       {"str", "tuple[int]", "dict[str, str]"}},
      {"type L = list[int]\nM = dict[str, int]\nx: L\ny: M\n$x\n$y\n", {"list[int]", "dict[str, int]"}},
      {"def f(x=1, y='a', z=None):\n  $x; $y\n", {"int", "str"}},
  });
}

TEST(Inference, KnowsNamesOfPython2) {
  Check(
      {
          {"$a = unicode('a')\n$b = raw_input()\n$c = long(1)\n$d = unichr(1)\nfor $e in xrange(3): pass\n",
           {"str", "str", "int", "str", "int"}},
          {"try: pass\nexcept ValueError, $e: pass\n", {"ValueError"}},
          {"$a = `1`\n$b = 10L\n$c = 0777\n", {"str", "int", "int"}},
          {"class A:\n  __metaclass__ = M\n  x = 1\nA.$x\n", {"int"}},
      },
      Version::Of(2, 7));
}

TEST(Inference, GuessesParametersFromCallers) {
  Check({
      {"def f(x):\n  $x\nf(1)\nf('a')\n", {"int | str"}},
      {"class A:\n  def __init__(self, x):\n    self.x = x\n  def m(self):\n    self.$x\nA(1)\n", {"int"}},
      {"def f(x, *args, **kw):\n  $args\n  $kw\nf(1, 'a', k=2)\n", {"tuple[str]", "dict[str, int]"}},
      {"class A:\n  def m(self, x):\n    $x\nA().m(1)\n", {"int"}},
      {"def f(x):\n  $x\n  f(x)\n", {""}},
  });
}

TEST(Inference, AsksGetattr) {
  Check({
      {"class A:\n  x = 'a'\n  def __getattr__(self, name): return 1\nA().$y\nA().$x\n", {"int", "str"}},
      {"class A:\n  def __getattr__(self, name): return 1\nclass B(A): pass\nB().$y\nB.$y\n", {"int", ""}},
  });
}

TEST(Inference, EndsInRings) {
  Check({
      {"x = x\n$x\n", {""}},
      {"a = b\nb = a\n$a\n", {""}},
      {"def f(x): return [f(x)]\n$a = f(1)\n", {"list[list[list[list[...]]]]"}},
      {"class A(B): x = 1\nclass B(A): pass\nB().$x\n", {"int"}},
      {"class A:\n  def m(self):\n    self.x = self.m()\n    return self.x\nA().$x\n", {""}},
      {"x = 1\nfor i in g():\n  x = x + 1\n$x\n", {"int"}},
      {"def f(n):\n  if n == 0: return 1\n  return n * f(n - 1)\n$a = f(3)\n", {"int"}},
  });
  std::string chain = "x0 = 1\n";
  for (int i = 1; i < 10000; ++i) chain += "x" + std::to_string(i) + " = x" + std::to_string(i - 1) + "\n";
  Program(chain + "$x9999\n").AllTypes();
  std::string dots = "$a";
  for (int i = 0; i < 10000; ++i) dots += ".a";
  Program(dots + "\n").AllTypes();
  std::string classes = "class C0: x = 1\n";
  for (int i = 1; i < 2000; ++i) classes += "class C" + std::to_string(i) + "(C" + std::to_string(i - 1) + "): pass\n";
  Program(classes + "C1999.$x\n").AllTypes();
}

TEST(Inference, KnowsTheLastOfManyCalls) {
  static constexpr int kCalls = 60;
  std::string text = "def same(x): return x\n";
  std::vector<std::string> types;
  for (int i = 0; i < kCalls; ++i) {
    const std::string name = "C" + std::to_string(i);
    text += "class " + name + ": pass\n$v" + name + " = same(" + name + "())\n";
    types.push_back("a." + name);
  }
  EXPECT_EQ(Program(text).AllTypes(), types);
}

}  // namespace
TEST(Inference, KnowsWhatFunctionsAreCalledWithByWhatTheyAreGivenTo) {
  Check({
      {"a = sorted(['x'], key=lambda $k: k.upper())\n$b = list(map(lambda $x: x + 1, [1]))\n",
       {"str", "list[int]", "int"}},
      {"def apply(f, x):\n  return f(x)\napply(lambda $y: y, 3)\n", {"int"}},
      {"def outer():\n  def inner($x):\n    return x\n  return inner\nouter()('a')\n", {"str"}},
      {"def times(n):\n  def wrap(f):\n    def call($x):\n      return f(x)\n    return call\n  return wrap\n"
       "@times(3)\ndef g(x):\n  return x\ng(1.5)\n",
       {"float"}},
  });
}

TEST(Inference, KnowsWhatIsPutIntoWhatAContainerHolds) {
  Check({
      {"a = {}\nfor n in [1]:\n  a.setdefault('k', []).append(n)\n$b = a\n", {"dict[str, list[int]]"}},
      {"a = []\na += ['x']\n$b = a[0]\n", {"str"}},
      {"import collections\na = collections.defaultdict(list)\na['k'].append(1)\n$b = a['k'][0]\n", {"int"}},
      {"a = {}\na.update({'k': 1.5}, m=2)\n$b = a['k']\n", {"float | int"}},
  });
}

TEST(Inference, KnowsWhatAnAttributeWasJustGiven) {
  Check({
      {"class A:\n  pass\na = A()\na.x = 1\na.$x\nA.y = 'y'\nA().$y\n", {"int", "str"}},
      {"class N:\n  def __init__(self):\n    self.n = None\na = N()\na.n = N()\na.$n\n", {"a.N"}},
      {"class A:\n  @property\n  def x(self):\n    return 'x'\n  @x.setter\n  def x(self, v):\n    pass\n"
       "a = A()\na.x = 1\na.$x\n",
       {"str"}},
      {"d = {'a': 1, 'b': ''}\nd['a'] = 1.5\n$e = d['a']\n", {"float"}},
      {"a = None\ndef f():\n  global a\n  a = 1\nf()\n$b = a\n", {"None | int"}},
  });
}

TEST(Inference, KnowsWhatAClassMakesThatMayMakeSomethingElse) {
  Check({
      {"class P: pass\nclass E:\n  def __new__(cls, *a):\n    return object.__new__(cls)\n"
       "class S(E):\n  def __new__(cls, p):\n    if z: return P()\n    return E.__new__(cls, p)\n$s = S(1)\n",
       {"a.S"}},
      {"class A:\n  @classmethod\n  def make(cls):\n    $self = cls.__new__(cls)\n    return self\n", {"a.A"}},
  });
}

TEST(Inference, KnowsThatTheEndOfAFunctionGivesNone) {
  Check({
      {"def f(x):\n  if x:\n    return 1\n$a = f(y)\n", {"None | int"}},
      {"def f(x):\n  while True:\n    if x:\n      return 1\n$a = f(y)\n", {"int"}},
      {"def f(x):\n  while True:\n    if x:\n      break\n    return 1\n$a = f(y)\n", {"None | int"}},
      {"def f(x):\n  try:\n    return 1\n  except E:\n    raise\n  finally:\n    x()\n$a = f(y)\n", {"int"}},
      {"def f(x):\n  match x:\n    case 1:\n      return 1\n    case _:\n      raise E\n$a = f(y)\n", {"int"}},
      {"import sys\ndef f(x):\n  if x:\n    return 1\n  sys.exit(2)\n$a = f(y)\n", {"int"}},
  });
}

TEST(Inference, KnowsKeywordsOfDictAndWhatClassesGiveForItems) {
  Check({
      {"a = dict(x=1, y='')\n$b = a['x']\n$c = dict(a, x=1.5)['x']\n", {"int", "float"}},
      {"class A:\n  def __class_getitem__(cls, k):\n    return [k]\n$a = A[1]\n", {"list[int]"}},
  });
}

TEST(Inference, GivesEachTargetItsItem) {
  Check({
      {"$a, $b = [1, '']\n[$c, ($d, $e)] = 1.5, [b'', 2]\n", {"int", "str", "float", "bytes", "int"}},
      {"a, b, $c = 1, ''\n$d, $e = 1, '', 2.5\n", {"", "int", "str"}},
      {"$a, *$b, $c = [1, '', 2.5, b'']\n*$d, $e = [1, '']\n",
       {"int", "list[float | str]", "bytes", "list[int]", "str"}},
      {"$a, *$b, $c = 1, '', 2.5, b''\n", {"int", "list[float | str]", "bytes"}},
  });
}

TEST(Inference, KnowsWhatEveryModuleHas) {
  Check({{"import types\n$a = types.__name__\n$b = types.__spec__\n$c = types.shown\n$d = types.__file__\n",
          {"str", "None | str", "", "str"}}});
}

TEST(Inference, GuessesPowersOfNumbers) {
  Check({
      {"def f(a: int, b: float, c: str):\n  $x = a ** a\n  $y = a ** b\n  $z = b ** a\n  $u = b ** b\n  $v = c ** a\n"
       "  $w = a ** c\n",
       {"int", "float", "float", "float", "", ""}},
  });
}

TEST(Inference, KnowsWhichReturnACallComesTo) {
  Check({
      {"def f(x):\n  if isinstance(x, int): return 1\n  return 'a'\n$a = f(1)\n$b = f('')\n$c = f(z)\n",
       {"int", "str", "int | str"}},
      {"def f(x):\n  if isinstance(x, (int, bytes)): return 1\n  return 'a'\n$a = f(b'')\n$b = f('')\n",
       {"int", "str"}},
      {"def f(x=None):\n  if x is None: return 1\n  return 'a'\n$a = f()\n$b = f('')\n", {"int", "str"}},
      {"def f(x=None):\n  if x is not None: return 1\n  return 'a'\n$a = f()\n$b = f('')\n", {"str", "int"}},
  });
}

TEST(Inference, BelievesDocstrings) {
  Check({
      {"def f(x, y, z):\n  ''':type x: int\n  @type y: list of str\n  :param float z: much\n  :rtype: (int, str)\n  "
       "'''\n"
       "  $x, $y, $z\n$a = f(u, v, w)\n",
       {"int", "list[str]", "float", "tuple[int, str]"}},
      {"def f(x, y, z, u=None):\n  '''Does it.\n\n  Args:\n    x (str): a\n    y (int or None): b\n    z (dict[str]): "
       "c\n"
       "    u (int, optional): d\n  '''\n  $x, $y, $z, $u\n",
       {"str", "None | int", "dict[str, str]", "int"}},
      {"class C: pass\ndef f(x, y):\n  '''Does it.\n\n  Parameters\n  ----------\n  x : string\n  y : :class:`C`\n\n"
       "  Returns\n  -------\n  n : integer\n  '''\n  $x, $y\n$a = f(u, v)\n",
       {"str", "a.C", "int"}},
      {"def f(x):\n  '''Does it.\n\n  Yields\n  -------\n  dictionary\n  '''\n  return x()\n$a = f(u)\n", {"dict"}},
      {"class A:\n  ''':type x: int'''\n  def __init__(self, x, y):\n    ''':type y: str'''\n    $x, $y\n",
       {"int", "str"}},
      {"def f(x):\n  a = 1\n  ''':type x: int'''\n  $x\n", {""}},
  });
}

TEST(Inference, KnowsTheTuplesAmongParametersOfPython2) {
  Check(
      {
          {"def f(a, ($b, (c, $d))): return $c\n$e = f(1, ('x', (2, 1.5)))\n", {"str", "float", "int", "int"}},
          {"def f(a, ($b, c)=(1, 'x')):\n  $c\n", {"int", "str"}},
          {"f = lambda (a, b): b\n$c = f((1, 'x'))\n", {"str"}},
      },
      Version::Of(2, 7));
}

TEST(Inference, KnowsLiteralKeysHoweverTheyAreSpelled) {
  Check({
      {"k = {'a': 1, u'b': 'x', b'c': 1.5, 'd' \"e\": None, r'f': b'', 'g\\n': True}\n"
       "$a = k[\"a\"]\n$b = k['b']\n$c = k[b'c']\n$d = k['de']\n$e = k['d' 'e']\n$f = k['f']\n$g = k['g\\n']\n"
       "$h = k[\"\"\"a\"\"\"]\n",
       {"int", "str", "float", "None", "None", "bytes", "bool", "int"}},
      // Bytes are no text, and a raw string is what it is spelled: what is there is one of all.
      {"k = {'a': 1, 'b\\n': 'x'}\n$a = k[b'a']\n$b = k[r'b\\n']\n", {"int | str", "int | str"}},
  });
  Check({{"k = {'a': 1, 'b': 'x'}\n$a = k[b'a']\n$b = k[u'b']\n", {"int", "str"}}}, Version::Of(2, 7));
}

TEST(Inference, KnowsWhatANamedTupleIsMadeOf) {
  Check({
      {"from collections import namedtuple\nP = namedtuple('P', 'x y')\np = P(1, y='a')\n$a = p.x\n$b = p.y\n"
       "$c = p[1]\n$d, $e = p\n$f = P(*z).x\n$g = p._replace(x='b').x\n$h = [P(1, 2), P(3, 'a')][0]\n"
       "def made(n): return P(n, n)\n$i = made(b'').x\n",
       {"int", "str", "str", "int", "str", "", "", "a.P", "bytes"}},
      {"from collections import namedtuple\nclass Q(namedtuple('P', 'x')):\n  def m(self): return self.x\n"
       "$a = Q('b').m()\nclass R(Q):\n  def __new__(cls, y): return Q.__new__(cls, 1)\n$b = R('b').x\n",
       {"str", ""}},
  });
}

TEST(Inference, KnowsTheItemsOfBasesWithArguments) {
  Check({
      {"class A(tuple[int, str]):\n  def f(self): return self[0]\nclass B(tuple[int, ...]): pass\n"
       "Keys = dict[str, float]\nclass C(Keys): pass\nclass D(list[A]): pass\n"
       "$a = A()[1]\n$b = A().f()\nfor $c in A(): pass\n$d = B()[0]\n$e = C()['']\n$f = D()[0][0]\n",
       {"int | str", "int | str", "int | str", "int", "float", "int | str"}},
  });
}

TEST(Inference, KnowsWhatIsGottenFromATypedDictionary) {
  Check({
      {"from typing import TypedDict\nclass M(TypedDict):\n  name: str\n  year: int\ndef f(m: M, k: str, n: M | "
       "dict):\n"
       "  $a = m.get('name')\n  $b = m.get('year', '')\n  $c = m.get('year', 0)\n  $d = m['name']\n",
       {"None | str", "int | str", "int", "str"}},
  });
}

TEST(Inference, KnowsWhatATestIsGivenByItsFixtures) {
  Program program({
      {"tests/test_a.py",
       "import pytest\nclass Shop: pass\n@pytest.fixture\ndef shop(): return Shop()\n@pytest.fixture(scope='module')\n"
       "def door(shop):\n  yield [$shop]\ndef test(shop, door, cash, other, missing):\n"
       "  $shop\n  $door\n  $cash\n  $other\n  $missing\ndef plain(shop): $shop\n"
       "class TestIn:\n  @pytest.fixture\n  def shop(self): return 1\n  def test(self, shop): $shop\n"
       "@pytest.fixture\ndef cash(cash): return [cash]\n"},
      {"tests/conftest.py", "import pytest\n@pytest.fixture\ndef cash(): return 1.5\ndef other(): return 1\n"},
      {"conftest.py", "import pytest\n@pytest.fixture\ndef missing(): return b''\n"},
  });
  std::vector<std::string> types = program.AllTypes();
  for (std::string& type : types) {
    type = WithoutBuiltins(type);
    for (size_t at; (at = type.find("tests.")) != std::string::npos;) type.erase(at, 6);
  }
  EXPECT_EQ(types, (std::vector<std::string>{"test_a.Shop", "test_a.Shop", "list[test_a.Shop]", "list[float]", "",
                                             "bytes", "", "int"}));
  // That is a guess.
  EXPECT_EQ(program->HoverAt(program[1].file, program[1].offset).certainty, Certainty::kLikely);
}

}  // namespace quillet
